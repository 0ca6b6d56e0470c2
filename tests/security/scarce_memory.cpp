// SPDX-License-Identifier: Apache-2.0
#include "tests/security/scarce_memory.h"

#include <atomic>
#include <cstddef>
#include <cstdlib>
#include <limits>
#include <new>

namespace {

constexpr long PLENTY = std::numeric_limits<long>::max() / 2;

constinit std::atomic<bool> g_isScarce{false};
constinit std::atomic<bool> g_isCallerPoor{false};
constinit std::atomic<bool> g_isLasting{false};
constinit std::atomic<long> g_left{0};
constinit std::atomic<long> g_refused{0};

constinit thread_local bool t_isCaller = false;
constinit thread_local int t_plenty = 0;

bool IsRefused() noexcept {
    if (!g_isScarce.load() || t_plenty > 0 || g_isCallerPoor.load() != t_isCaller)
        return false;
    const long left = g_left.fetch_sub(1);
    if (left > 0 || (left < 0 && !g_isLasting.load()))
        return false;
    g_refused.fetch_add(1);
    return true;
}

void* Allocate(std::size_t size) noexcept {
    return IsRefused() ? nullptr : std::malloc(size != 0 ? size : 1);
}

} // namespace

CScarceMemory::CScarceMemory(Poor poor, Lack lack, long allocations) {
    t_isCaller = true;
    g_isCallerPoor = poor == Poor::Caller;
    g_isLasting = lack == Lack::Lasting;
    g_left = allocations;
    g_refused = 0;
    g_isScarce = true;
}

long CScarceMemory::End() {
    g_isScarce = false;
    t_isCaller = false;
    return g_refused;
}

CPlentyScope::CPlentyScope() {
    ++t_plenty;
}

CPlentyScope::~CPlentyScope() {
    --t_plenty;
}

long CountAllocations(Poor poor, const std::function<void()>& work) {
    CScarceMemory counted(poor, Lack::Lasting, PLENTY);
    work();
    counted.End();
    return PLENTY - g_left.load();
}

// Never inlined: next to an allocation that was not, the compiler would take them for a mismatch.
[[gnu::noinline]] void* operator new(std::size_t size) {
    if (void* const block = Allocate(size))
        return block;
    throw std::bad_alloc();
}
[[gnu::noinline]] void* operator new[](std::size_t size) {
    if (void* const block = Allocate(size))
        return block;
    throw std::bad_alloc();
}
[[gnu::noinline]] void* operator new(std::size_t size, const std::nothrow_t&) noexcept {
    return Allocate(size);
}
[[gnu::noinline]] void* operator new[](std::size_t size, const std::nothrow_t&) noexcept {
    return Allocate(size);
}
[[gnu::noinline]] void operator delete(void* block) noexcept {
    std::free(block);
}
[[gnu::noinline]] void operator delete[](void* block) noexcept {
    std::free(block);
}
[[gnu::noinline]] void operator delete(void* block, std::size_t) noexcept {
    std::free(block);
}
[[gnu::noinline]] void operator delete[](void* block, std::size_t) noexcept {
    std::free(block);
}
[[gnu::noinline]] void operator delete(void* block, const std::nothrow_t&) noexcept {
    std::free(block);
}
[[gnu::noinline]] void operator delete[](void* block, const std::nothrow_t&) noexcept {
    std::free(block);
}
