// SPDX-License-Identifier: Apache-2.0
#include "platform/pixel_rows.h"

#include "tests/support/test_effort.h"

#include <gtest/gtest.h>
#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cstdint>
#include <random>
#include <string>
#include <vector>

/// Rows against a model that goes pixel by pixel, with and without wide registers.

namespace {

using namespace platform;
using Bytes = std::vector<std::uint8_t>;

constexpr std::array LAYOUTS{CGPixelLayout::RGB,  CGPixelLayout::RGBX, CGPixelLayout::RGBA,
                             CGPixelLayout::ARGB, CGPixelLayout::BGRX, CGPixelLayout::BGRA};

struct Colour {
    int red, green, blue, alpha;
};

/// Where red, green, blue and the fourth byte lie.
std::array<std::size_t, 4> Places(CGPixelLayout layout) {
    switch (layout) {
        case CGPixelLayout::ARGB:
            return {1, 2, 3, 0};
        case CGPixelLayout::BGRX:
        case CGPixelLayout::BGRA:
            return {2, 1, 0, 3};
        default:
            return {0, 1, 2, 3};
    }
}

Colour ColourAt(const Bytes& row, CGPixelLayout layout, std::size_t at) {
    const auto places = Places(layout);
    const std::uint8_t* const pixel = row.data() + at * CGBytesPerPixel(layout);
    return {pixel[places[0]], pixel[places[1]], pixel[places[2]],
            CGHasAlpha(layout) ? pixel[places[3]] : 255};
}

void Write(Bytes& row, CGPixelLayout layout, std::size_t at, const Colour& colour) {
    const auto places = Places(layout);
    std::uint8_t* const pixel = row.data() + at * CGBytesPerPixel(layout);
    pixel[places[0]] = static_cast<std::uint8_t>(colour.red);
    pixel[places[1]] = static_cast<std::uint8_t>(colour.green);
    pixel[places[2]] = static_cast<std::uint8_t>(colour.blue);
    if (layout != CGPixelLayout::RGB)
        pixel[places[3]] = static_cast<std::uint8_t>(CGHasAlpha(layout) ? colour.alpha : 255);
}

int Over(int above, int below, int alpha) {
    const double rest = below * (255 - alpha) / 255.0;
    return std::min(above + static_cast<int>(rest + 0.5), 255);
}

Colour Over(const Colour& above, const Colour& below) {
    return {Over(above.red, below.red, above.alpha), Over(above.green, below.green, above.alpha),
            Over(above.blue, below.blue, above.alpha), Over(above.alpha, below.alpha, above.alpha)};
}

enum class Content {
    Noise,
    Opaque,
    Empty,
    Stretches
};

class Row {
public:
    Row(std::mt19937& random, CGPixelLayout layout, std::size_t count, Content content)
        : bytes(count * CGBytesPerPixel(layout)) {
        for (std::uint8_t& byte : bytes)
            byte = static_cast<std::uint8_t>(random());
        if (layout == CGPixelLayout::RGB || content == Content::Noise)
            return;
        Content now = content;
        for (std::size_t i = 0; i < count; ++i) {
            if (content == Content::Stretches && random() % 200 == 0)
                now = static_cast<Content>(random() % 3);
            std::uint8_t* const pixel = bytes.data() + i * 4;
            if (now == Content::Opaque)
                pixel[Places(layout)[3]] = 255;
            else if (now == Content::Empty)
                std::fill_n(pixel, 4, std::uint8_t{0});
        }
    }

    Bytes bytes;
};

class PixelRows : public testing::TestWithParam<bool> {
protected:
    PixelRows() { AllowWideLoops(GetParam()); }
    ~PixelRows() override { AllowWideLoops(true); }

    std::size_t SomeCount() { return 1 + m_random() % 700; }
    CGPixelLayout SomeLayout() { return LAYOUTS[m_random() % LAYOUTS.size()]; }
    Content SomeContent() { return static_cast<Content>(m_random() % 4); }

    const unsigned m_seed = std::random_device{}();
    std::mt19937 m_random{m_seed};
};

std::string Named(CGPixelLayout from, CGPixelLayout to, std::size_t count, unsigned seed) {
    return std::to_string(static_cast<int>(from)) + " to " + std::to_string(static_cast<int>(to)) + ", " +
           std::to_string(count) + " pixels, seed " + std::to_string(seed);
}

} // namespace

TEST_P(PixelRows, AreConvertedPixelByPixel) {
    for (int i = 0; i < 3000 * TestEffort(); ++i) {
        const CGPixelLayout from = SomeLayout();
        const CGPixelLayout to = SomeLayout();
        const std::size_t count = SomeCount();
        const Row source(m_random, from, count, SomeContent());
        Bytes target(count * CGBytesPerPixel(to), 0x5a);
        Bytes expected = target;
        for (std::size_t at = 0; at < count; ++at)
            Write(expected, to, at, ColourAt(source.bytes, from, at));
        ConvertRow(from, source.bytes.data(), to, target.data(), count);
        ASSERT_EQ(target, expected) << Named(from, to, count, m_seed);
        if (from == CGPixelLayout::RGB || to == CGPixelLayout::RGB)
            continue;
        Bytes inPlace = source.bytes;
        ConvertRow(from, inPlace.data(), to, inPlace.data(), count);
        ASSERT_EQ(inPlace, expected) << "in place, " << Named(from, to, count, m_seed);
    }
}

TEST_P(PixelRows, AreLaidOverOthersPixelByPixel) {
    for (int i = 0; i < 3000 * TestEffort(); ++i) {
        const CGPixelLayout from = SomeLayout();
        const CGPixelLayout to = SomeLayout();
        const std::size_t count = SomeCount();
        const Row source(m_random, from, count, SomeContent());
        Bytes target = Row(m_random, to, count, Content::Noise).bytes;
        Bytes expected = target;
        for (std::size_t at = 0; at < count; ++at)
            Write(expected, to, at, Over(ColourAt(source.bytes, from, at), ColourAt(target, to, at)));
        DrawRow(from, source.bytes.data(), to, target.data(), count);
        ASSERT_EQ(target, expected) << Named(from, to, count, m_seed);
    }
}

TEST_P(PixelRows, AreConvertedToTheLastPixelBeforeTheEndOfMemory) {
    const auto page = static_cast<std::size_t>(sysconf(_SC_PAGESIZE));
    const std::size_t length = 4 * page;
    void* const mapped =
        mmap(nullptr, length + page, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
    ASSERT_NE(mapped, MAP_FAILED);
    auto* const memory = static_cast<std::uint8_t*>(mapped);
    ASSERT_EQ(mprotect(memory + length, page, PROT_NONE), 0);
    for (const std::size_t count : {511U, 512U, 513U, 527U, 528U, 1920U, 1999U}) {
        const Row source(m_random, CGPixelLayout::BGRX, count, Content::Noise);
        Bytes expected(count * 4 + 4, 0x5a); // with the pixel before
        for (std::size_t at = 0; at < count; ++at)
            Write(expected, CGPixelLayout::RGBA, at + 1, ColourAt(source.bytes, CGPixelLayout::BGRX, at));
        std::fill_n(memory, length, std::uint8_t{0x5a});
        std::uint8_t* const row = memory + length - count * 4;
        ConvertRow(CGPixelLayout::BGRX, source.bytes.data(), CGPixelLayout::RGBA, row, count);
        EXPECT_EQ(Bytes(row - 4, memory + length), expected) << count << " pixels, seed " << m_seed;
    }
    munmap(mapped, length + page);
}

/// Of any place in memory: what is written past the cache begins at a line of it.
TEST_P(PixelRows, OfPicturesAreThoseThatAreDrawnOneByOne) {
    for (int i = 0; i < TestRounds(40); ++i) {
        const CGPixelLayout from = SomeLayout();
        const CGPixelLayout to = SomeLayout();
        const std::size_t count = 1 + m_random() % 2000;
        // On both sides of where pictures become large ones.
        const std::size_t rows = 1 + m_random() % (400'000 / count + 2);
        const std::size_t sourceStride = count * CGBytesPerPixel(from) + m_random() % 9;
        const std::size_t targetStride = count * CGBytesPerPixel(to) + m_random() % 9;
        const Row source(m_random, CGPixelLayout::RGB, (sourceStride * rows + 70) / 3, Content::Noise);
        const std::size_t sourceStart = m_random() % 65;
        const std::size_t targetStart = m_random() % 65;
        Bytes target(targetStride * rows + 130, 0x5a);
        Bytes expected = target;
        const PixelRowsIn in{source.bytes.data() + sourceStart, sourceStride};
        for (std::size_t y = 0; y < rows; ++y)
            DrawRow(from, in.Row(y), to, expected.data() + targetStart + y * targetStride, count);
        DrawRows(from, in, to, {target.data() + targetStart, targetStride}, count, rows);
        ASSERT_EQ(target, expected) << rows << " rows, " << Named(from, to, count, m_seed);
    }
}

/// The last row of a large picture ends where memory does, at the beginning and at the end.
TEST_P(PixelRows, OfLargePicturesStayWithinTheirMemory) {
    constexpr std::size_t COUNT = 1024;
    constexpr std::size_t ROWS = 512;
    const auto page = static_cast<std::size_t>(sysconf(_SC_PAGESIZE));
    const std::size_t length = COUNT * ROWS * 4;
    const auto map = [&] {
        void* const mapped = mmap(nullptr, length + 2 * page, PROT_NONE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
        auto* const memory = static_cast<std::uint8_t*>(mapped) + page;
        EXPECT_EQ(mprotect(memory, length, PROT_READ | PROT_WRITE), 0);
        return memory;
    };
    std::uint8_t* const source = map();
    std::uint8_t* const target = map();
    for (std::size_t i = 0; i < length; ++i)
        source[i] = static_cast<std::uint8_t>(m_random());
    DrawRows(CGPixelLayout::BGRX, {source, COUNT * 4}, CGPixelLayout::RGBX, {target, COUNT * 4}, COUNT, ROWS);
    for (std::size_t i = 0; i < length; i += 4) {
        const std::array<std::uint8_t, 4> expected{source[i + 2], source[i + 1], source[i], 255};
        ASSERT_TRUE(std::equal(expected.begin(), expected.end(), target + i)) << "pixel " << i / 4;
    }
    munmap(source - page, length + 2 * page);
    munmap(target - page, length + 2 * page);
}

INSTANTIATE_TEST_SUITE_P(Registers, PixelRows, testing::Bool(),
                         [](const auto& each) { return each.param ? "Wide" : "Baseline"; });
