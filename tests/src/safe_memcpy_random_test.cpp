// SPDX-License-Identifier: Apache-2.0
#include "src/safe_memcpy.h"
#include "tests/support/test_effort.h"

#include <gtest/gtest.h>

#include <array>
#include <cstddef>
#include <cstdio>
#include <cstring>
#include <random>
#include <string>
#include <vector>

/// The fills and moves against plain loops: both work on a memory of random bytes, at random addresses, and
/// the whole memory must be the same afterwards. That the comparison would notice is shown on primitives with
/// planted faults.

namespace {

using Memory = std::vector<unsigned char>;

constexpr int kRounds = 100'000;
constexpr std::size_t kMemorySize = 1024;
constexpr unsigned kLongest = 200;

using FillBytes = void (*)(void*, unsigned, unsigned char);
using Fill16 = void (*)(unsigned short*, unsigned, unsigned short);
using Fill32 = void (*)(unsigned*, unsigned, unsigned);
using Move = void (*)(void*, const void*, unsigned);

struct Primitives {
    FillBytes set = mem_prim_set;
    Fill16 set16 = mem_prim_set16;
    Fill32 set32 = mem_prim_set32;
    Move move = mem_prim_move;
    Move move8 = mem_prim_move8;
    Move move16 = mem_prim_move16;
    Move move32 = mem_prim_move32;
};

/// One call of a primitive.
struct Call {
    int primitive;
    std::size_t to;
    std::size_t from;
    unsigned length;
    unsigned value;
};

constexpr std::array<const char*, 7> kNames = {"set", "set16", "set32", "move", "move8", "move16", "move32"};
constexpr std::array<std::size_t, 7> kElementSizes = {1, 2, 4, 1, 1, 2, 4};

std::string Describe(const Call& call) {
    const auto i = static_cast<std::size_t>(call.primitive);
    return std::string(kNames[i]) + " to " + std::to_string(call.to) + " from " + std::to_string(call.from) +
           ", length " + std::to_string(call.length);
}

void Make(const Primitives& primitives, const Call& call, Memory& memory) {
    void* const to = memory.data() + call.to;
    const void* const from = memory.data() + call.from;
    switch (call.primitive) {
        case 0:
            return primitives.set(to, call.length, static_cast<unsigned char>(call.value));
        case 1:
            return primitives.set16(static_cast<unsigned short*>(to), call.length,
                                    static_cast<unsigned short>(call.value));
        case 2:
            return primitives.set32(static_cast<unsigned*>(to), call.length, call.value);
        case 3:
            return primitives.move(to, from, call.length);
        case 4:
            return primitives.move8(to, from, call.length);
        case 5:
            return primitives.move16(to, from, call.length);
        default:
            return primitives.move32(to, from, call.length);
    }
}

/// What the call should do, byte by byte.
void MakePlainly(const Call& call, Memory& memory) {
    const std::size_t size = kElementSizes[static_cast<std::size_t>(call.primitive)];
    const std::size_t bytes = call.length * size;
    std::array<unsigned char, 4> value{};
    std::memcpy(value.data(), &call.value, value.size());
    const Memory before = memory;
    for (std::size_t i = 0; i < bytes; ++i)
        memory[call.to + i] = call.primitive < 3 ? value[i % size] : before[call.from + i];
}

/// Areas lie close enough to overlap often; one length in three is below ten.
Call RandomCall(std::mt19937& random) {
    const auto length = static_cast<unsigned>(random() % (random() % 3 == 0 ? 10 : kLongest));
    return {static_cast<int>(random() % kNames.size()), random() % kLongest, random() % kLongest, length,
            static_cast<unsigned>(random())};
}

/// The first call whose result differs from the plain one; empty when none of `rounds` does.
std::string FirstDifference(const Primitives& primitives, int rounds, unsigned seed) {
    std::mt19937 random(seed);
    Memory memory(kMemorySize);
    for (unsigned char& byte : memory)
        byte = static_cast<unsigned char>(random());
    for (int round = 0; round < rounds; ++round) {
        const Call call = RandomCall(random);
        Memory expected = memory;
        MakePlainly(call, expected);
        Make(primitives, call, memory);
        if (memory != expected)
            return Describe(call);
        // Fills wear the memory out: moves between equal bytes would prove nothing.
        memory[random() % kMemorySize] = static_cast<unsigned char>(random());
        if (round % 16 == 0) {
            for (std::size_t i = 0; i < kMemorySize; ++i)
                memory[i] = static_cast<unsigned char>(random());
        }
    }
    return "";
}

// The faults.

void SetWithoutTheLastByteOfAnOddTail(void* dest, unsigned len, unsigned char value) {
    mem_prim_set(dest, len % 4 == 3 ? len - 1 : len, value);
}

void Set16OneTooMany(unsigned short* dest, unsigned len, unsigned short value) {
    mem_prim_set16(dest, len % 16 == 15 ? len + 1 : len, value);
}

void Set32OfTheLowByte(unsigned* dest, unsigned len, unsigned value) {
    mem_prim_set(dest, len * 4, static_cast<unsigned char>(value));
}

void MoveForwardsOnly(void* dest, const void* src, unsigned len) {
    auto* const to = static_cast<unsigned char*>(dest);
    const auto* const from = static_cast<const unsigned char*>(src);
    for (unsigned i = 0; i < len; ++i)
        to[i] = from[i];
}

void MoveBackwardsOnly(void* dest, const void* src, unsigned len) {
    auto* const to = static_cast<unsigned char*>(dest);
    const auto* const from = static_cast<const unsigned char*>(src);
    for (unsigned i = len; i-- > 0;)
        to[i] = from[i];
}

void Move16AsBytes(void* dest, const void* src, unsigned len) {
    mem_prim_move8(dest, src, len);
}

void MoveWithoutTheLastByte(void* dest, const void* src, unsigned len) {
    mem_prim_move(dest, src, len > 100 ? len - 1 : len);
}

} // namespace

TEST(MemPrim, AgreesWithPlainLoops) {
    const int rounds = kRounds * TestEffort();
    const unsigned seed = std::random_device{}();
    std::printf("%d calls, seed %u\n", rounds, seed);
    EXPECT_EQ(FirstDifference({}, rounds, seed), "") << "seed " << seed;
}

TEST(MemPrim, IsComparedByATestThatSeesPlantedFaults) {
    std::vector<Primitives> broken(7);
    broken[0].set = SetWithoutTheLastByteOfAnOddTail;
    broken[1].set16 = Set16OneTooMany;
    broken[2].set32 = Set32OfTheLowByte;
    broken[3].move = MoveForwardsOnly;
    broken[4].move8 = MoveBackwardsOnly;
    broken[5].move16 = Move16AsBytes;
    broken[6].move = MoveWithoutTheLastByte;
    for (std::size_t i = 0; i < broken.size(); ++i)
        EXPECT_NE(FirstDifference(broken[i], kRounds, 1), "") << i;
}

TEST(MemPrim, SetsThreeBytesAndNoMore) {
    alignas(4) std::array<unsigned char, 8> bytes{};
    mem_prim_set(bytes.data() + 1, 3, 7);
    EXPECT_EQ(bytes, (std::array<unsigned char, 8>{0, 7, 7, 7, 0, 0, 0, 0}));
}

TEST(MemPrim, DoesNothingForALengthOfNothing) {
    mem_prim_set(nullptr, 0, 1);
    mem_prim_set16(nullptr, 0, 1);
    mem_prim_set32(nullptr, 0, 1);
    for (const Move move : {mem_prim_move, mem_prim_move8, mem_prim_move16, mem_prim_move32})
        move(nullptr, nullptr, 0);
}
