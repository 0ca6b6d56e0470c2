// SPDX-License-Identifier: Apache-2.0
#include "src/safe_memcpy.h"

#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>

namespace {

using Byte = unsigned char;
using Word = std::uint32_t;

constexpr int ERROR_NULL = 400;
constexpr int ERROR_ZERO = 401;
constexpr int ERROR_LENGTH = 403;
constexpr int ERROR_OVERLAP = 404;

constexpr int LENGTH_LIMIT = 0x10000000;

std::uintptr_t AddressOf(const void* pointer) {
    return reinterpret_cast<std::uintptr_t>(pointer);
}

/// Bytes from the last word boundary to `pointer`.
std::size_t BytesIntoWord(const void* pointer) {
    return AddressOf(pointer) % sizeof(Word);
}

// ---- Filling

/// Stores elements at any address, in blocks as long as there are enough of them.
template <class Element>
void Fill(Byte* to, std::size_t count, Element value) {
    constexpr std::size_t IN_A_BLOCK = 16;
    std::array<Element, IN_A_BLOCK> block;
    block.fill(value);
    for (; count >= IN_A_BLOCK; count -= IN_A_BLOCK, to += sizeof block)
        std::memcpy(to, block.data(), sizeof block);
    for (; count > 0; --count, to += sizeof value)
        std::memcpy(to, &value, sizeof value);
}

void FillBytes(Byte* to, std::size_t count, Byte value) {
    for (std::size_t i = 0; i < count; ++i)
        to[i] = value;
}

// ---- Moving

/// An element is read whole before it is stored, so that elements may overlap as the areas do.
template <class Element>
void CopyOne(Byte* to, const Byte* from) {
    Element element;
    std::memcpy(&element, from, sizeof element);
    std::memcpy(to, &element, sizeof element);
}

template <class Element>
void CopyForwards(Byte* to, const Byte* from, std::size_t count) {
    for (std::size_t i = 0; i < count; ++i)
        CopyOne<Element>(to + i * sizeof(Element), from + i * sizeof(Element));
}

template <class Element>
void CopyBackwards(Byte* to, const Byte* from, std::size_t count) {
    for (std::size_t i = count; i-- > 0;)
        CopyOne<Element>(to + i * sizeof(Element), from + i * sizeof(Element));
}

template <class Element>
void Move(void* dest, const void* src, std::size_t count) {
    auto* const to = static_cast<Byte*>(dest);
    const auto* const from = static_cast<const Byte*>(src);
    if (AddressOf(to) < AddressOf(from))
        CopyForwards<Element>(to, from, count);
    else
        CopyBackwards<Element>(to, from, count);
}

/// A stretch of bytes cut at its word boundaries.
struct Stretch {
    std::size_t head;
    std::size_t words;
    std::size_t tail;
};

/// `length` is at least the bytes up to the first boundary.
Stretch CutAtWords(const void* start, std::size_t length) {
    const std::size_t head = (sizeof(Word) - BytesIntoWord(start)) % sizeof(Word);
    return {head, (length - head) / sizeof(Word), (length - head) % sizeof(Word)};
}

void MoveWordsForwards(Byte* to, const Byte* from, std::size_t length) {
    const Stretch cut = CutAtWords(to, length);
    const std::size_t tail = length - cut.tail;
    CopyForwards<Byte>(to, from, cut.head);
    CopyForwards<Word>(to + cut.head, from + cut.head, cut.words);
    CopyForwards<Byte>(to + tail, from + tail, cut.tail);
}

void MoveWordsBackwards(Byte* to, const Byte* from, std::size_t length) {
    const Stretch cut = CutAtWords(to, length);
    const std::size_t tail = length - cut.tail;
    CopyBackwards<Byte>(to + tail, from + tail, cut.tail);
    CopyBackwards<Word>(to + cut.head, from + cut.head, cut.words);
    CopyBackwards<Byte>(to, from, cut.head);
}

// ---- Failing

[[gnu::cold]] int Refuse(const char* message, int error) {
    invoke_safe_lib_constraint_handler(message, nullptr, error);
    return error;
}

[[gnu::cold]] int RefuseAndClear(void* dest, int dmax, const char* message, int error) {
    mem_prim_set(dest, static_cast<unsigned>(dmax), 0);
    return Refuse(message, error);
}

/// By distances, so that an area at the end of the address space has no end that starts again at zero.
bool Overlap(const void* dest, int dmax, const void* src, int smax) {
    const std::uintptr_t to = AddressOf(dest);
    const std::uintptr_t from = AddressOf(src);
    return (to > from && to - from < static_cast<unsigned>(smax)) ||
           (from > to && from - to < static_cast<unsigned>(dmax));
}

} // namespace

constinit std::atomic<safe_lib_constraint_handler> current_constraint_handler{
    safe_lib_default_constraint_handler};
constinit std::atomic<safe_lib_constraint_handler> previous_constraint_handler{
    safe_lib_default_constraint_handler};

void safe_lib_default_constraint_handler(const char* /*message*/, void* /*context*/, int /*error*/) {}

void safe_lib_ignore_handler(const char* /*message*/, void* /*context*/, int /*error*/) {}

safe_lib_constraint_handler safe_lib_set_constraint_handler(safe_lib_constraint_handler handler) {
    const safe_lib_constraint_handler next =
        handler != nullptr ? handler : safe_lib_default_constraint_handler;
    const safe_lib_constraint_handler former =
        current_constraint_handler.exchange(next, std::memory_order_relaxed);
    previous_constraint_handler.store(former, std::memory_order_relaxed);
    return former;
}

void invoke_safe_lib_constraint_handler(const char* message, void* context, int error) {
    const safe_lib_constraint_handler handler = current_constraint_handler.load(std::memory_order_relaxed);
    if (handler != nullptr)
        handler(message, context, error);
}

int omnal_memcpy_s(void* dest, int dmax, const void* src, int smax) {
    if (dest == nullptr)
        return Refuse("memcpy_s: dest is NULL", ERROR_NULL);
    if (dmax == 0)
        return Refuse("memcpy_s: dmax is 0", ERROR_ZERO);
    if (dmax < 0 || dmax >= LENGTH_LIMIT)
        return Refuse("memcpy_s: dmax exceeds max", ERROR_LENGTH);
    if (smax == 0)
        return RefuseAndClear(dest, dmax, "memcpy_s: smax is 0", ERROR_ZERO);
    if (smax < 0 || smax > dmax)
        return RefuseAndClear(dest, dmax, "memcpy_s: smax exceeds dmax", ERROR_LENGTH);
    if (src == nullptr)
        return RefuseAndClear(dest, dmax, "memcpy_s: src is NULL", ERROR_NULL);
    if (Overlap(dest, dmax, src, smax))
        return RefuseAndClear(dest, dmax, "memcpy_s: overlap undefined", ERROR_OVERLAP);
    mem_prim_move(dest, src, static_cast<unsigned>(smax));
    return 0;
}

void mem_prim_set(void* dest, unsigned len, unsigned char value) {
    auto* const to = static_cast<Byte*>(dest);
    if (len < sizeof(Word)) {
        FillBytes(to, len, value);
        return;
    }
    const Stretch cut = CutAtWords(to, len);
    constexpr Word ONE_IN_EACH_BYTE = 0x01010101;
    FillBytes(to, cut.head, value);
    Fill<Word>(to + cut.head, cut.words, value * ONE_IN_EACH_BYTE);
    FillBytes(to + len - cut.tail, cut.tail, value);
}

void mem_prim_set16(unsigned short* dest, unsigned len, unsigned short value) {
    Fill(static_cast<Byte*>(static_cast<void*>(dest)), len, value);
}

void mem_prim_set32(unsigned* dest, unsigned len, unsigned value) {
    Fill(static_cast<Byte*>(static_cast<void*>(dest)), len, value);
}

void mem_prim_move(void* dest, const void* src, unsigned len) {
    auto* const to = static_cast<Byte*>(dest);
    const auto* const from = static_cast<const Byte*>(src);
    const bool isForwards = AddressOf(to) < AddressOf(from);
    const unsigned shortest = isForwards ? 4 : 5;
    if (len < shortest || BytesIntoWord(to) != BytesIntoWord(from)) {
        Move<Byte>(to, from, len);
        return;
    }
    if (isForwards)
        MoveWordsForwards(to, from, len);
    else
        MoveWordsBackwards(to, from, len);
}

void mem_prim_move8(void* dest, const void* src, unsigned len) {
    Move<Byte>(dest, src, len);
}

void mem_prim_move16(void* dest, const void* src, unsigned len) {
    Move<std::uint16_t>(dest, src, len);
}

void mem_prim_move32(void* dest, const void* src, unsigned len) {
    Move<std::uint32_t>(dest, src, len);
}
