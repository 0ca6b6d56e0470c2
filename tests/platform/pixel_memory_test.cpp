// SPDX-License-Identifier: Apache-2.0
#include "platform/pixel_memory.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <fstream>
#include <limits>
#include <new>
#include <string>
#include <utility>

namespace {

using namespace platform;

constexpr std::size_t MEGABYTE = std::size_t{1} << 20U;

bool IsZero(const PixelMemory& pixels, std::size_t bytes) {
    return std::all_of(pixels.get(), pixels.get() + bytes, [](unsigned char byte) { return byte == 0; });
}

/// Bytes of address space.
std::size_t MappedByProcess() {
    std::size_t pages = 0;
    std::ifstream("/proc/self/statm") >> pages;
    return pages * 4096;
}

TEST(PixelMemory, IsZeroedAndCanBeWrittenToTheLastByte) {
    for (const std::size_t bytes : {std::size_t{0}, std::size_t{1}, std::size_t{4097}, 4 * MEGABYTE - 1,
                                    4 * MEGABYTE, 4 * MEGABYTE + 1, std::size_t{1920} * 1080 * 4}) {
        PixelMemory pixels = NewPixelMemory(bytes);
        ASSERT_NE(pixels, nullptr) << bytes;
        EXPECT_TRUE(IsZero(pixels, bytes)) << bytes;
        std::fill_n(pixels.get(), bytes, static_cast<unsigned char>(0xFF));
        // Whoever comes next finds nothing of it.
        pixels = NewPixelMemory(bytes);
        EXPECT_TRUE(IsZero(pixels, bytes)) << bytes;
    }
}

TEST(PixelMemory, BeginsWhereALargePageMayIfItIsLarge) {
    const PixelMemory pixels = NewPixelMemory(8 * MEGABYTE + 5);
    EXPECT_EQ(reinterpret_cast<std::uintptr_t>(pixels.get()) % (2 * MEGABYTE), 0U);
}

TEST(PixelMemory, IsGivenBackByWhoeverHasItLast) {
    const std::size_t before = MappedByProcess();
    for (int i = 0; i < 100; ++i) {
        PixelMemory first = NewPixelMemory(8 * MEGABYTE);
        PixelMemory second = NewPixelMemory(16);
        std::swap(first, second);
        second[8 * MEGABYTE - 1] = 1;
        first[15] = 1;
    }
    EXPECT_LT(MappedByProcess(), before + 100 * MEGABYTE);
}

TEST(PixelMemory, ThatIsNowhereToBeHadThrows) {
    constexpr std::size_t MOST = std::numeric_limits<std::size_t>::max();
    for (const std::size_t bytes : {MOST / 4, MOST - 3 * MEGABYTE, MOST})
        EXPECT_THROW(NewPixelMemory(bytes), std::bad_alloc) << bytes;
}

} // namespace
