// SPDX-License-Identifier: Apache-2.0
#include "platform/pixel_region.h"

#include "tests/support/test_effort.h"

#include <gtest/gtest.h>

#include <bitset>
#include <cstddef>
#include <iostream>
#include <limits>
#include <random>
#include <utility>

namespace {

using platform::PixelRect;
using platform::PixelRegion;

using Rects = std::vector<PixelRect>;

constexpr int SIDE = 24;

/// The same as a region, as the pixels of a small square.
using Pixels = std::bitset<std::size_t{SIDE} * SIDE>;

std::size_t PlaceOf(int x, int y) {
    return static_cast<std::size_t>(y) * SIDE + static_cast<std::size_t>(x);
}

Pixels PixelsOf(const PixelRect& rect) {
    Pixels pixels;
    for (int y = rect.top; y < rect.bottom; ++y) {
        for (int x = rect.left; x < rect.right; ++x)
            pixels.set(PlaceOf(x, y));
    }
    return pixels;
}

/// By its rectangles, which must not overlap.
Pixels PixelsOf(const PixelRegion& region) {
    Pixels pixels;
    for (const PixelRect& rect : region.Rects()) {
        const Pixels more = PixelsOf(rect);
        EXPECT_TRUE((pixels & more).none());
        EXPECT_TRUE(more.any());
        pixels |= more;
    }
    return pixels;
}

PixelRegion RegionOf(const Rects& rects) {
    PixelRegion region;
    for (const PixelRect& rect : rects)
        region.Add(rect);
    return region;
}

TEST(PixelRegion, IsEmptyAtFirstAndAfterClear) {
    PixelRegion region;
    EXPECT_TRUE(region.IsEmpty());
    EXPECT_TRUE(region.Rects().empty());
    EXPECT_EQ(region.Bounds(), PixelRect());
    region.Add({1, 2, 3, 4});
    EXPECT_FALSE(region.IsEmpty());
    region.Clear();
    EXPECT_TRUE(region.IsEmpty());
    EXPECT_EQ(region.Bounds(), PixelRect());
}

TEST(PixelRegion, CoversNothingWithARectangleOfNoArea) {
    for (const PixelRect& rect :
         {PixelRect{3, 3, 3, 9}, PixelRect{3, 3, 9, 3}, PixelRect{9, 3, 3, 9}, PixelRect{3, 9, 9, 3}}) {
        EXPECT_TRUE(PixelRegion(rect).IsEmpty());
        PixelRegion region({0, 0, 10, 10});
        region.Add(rect);
        region.Subtract(rect);
        EXPECT_EQ(region, PixelRegion({0, 0, 10, 10}));
        region.Intersect(rect);
        EXPECT_TRUE(region.IsEmpty());
    }
}

TEST(PixelRegion, HasItsRightAndBottomOutside) {
    const PixelRegion region({2, 3, 5, 7});
    EXPECT_TRUE(region.Contains(2, 3));
    EXPECT_TRUE(region.Contains(4, 6));
    EXPECT_FALSE(region.Contains(5, 6));
    EXPECT_FALSE(region.Contains(4, 7));
    EXPECT_FALSE(region.Contains(1, 3));
    EXPECT_EQ(region.Bounds(), (PixelRect{2, 3, 5, 7}));
}

TEST(PixelRegion, GivesBandsFromTopToBottomAndFromLeftToRight) {
    const PixelRegion region = RegionOf({{6, 5, 8, 9}, {0, 5, 2, 9}, {3, 0, 5, 2}});
    EXPECT_EQ(region.Rects(), (Rects{{3, 0, 5, 2}, {0, 5, 2, 9}, {6, 5, 8, 9}}));
}

TEST(PixelRegion, TakesTheWholeRangeOfNumbers) {
    constexpr int LOWEST = std::numeric_limits<int>::min();
    constexpr int HIGHEST = std::numeric_limits<int>::max();
    PixelRegion region({LOWEST, LOWEST, HIGHEST, HIGHEST});
    region.Subtract(PixelRect{0, 0, HIGHEST, HIGHEST});
    EXPECT_TRUE(region.Contains(LOWEST, HIGHEST - 1));
    EXPECT_FALSE(region.Contains(0, 0));
    EXPECT_EQ(region.Bounds(), (PixelRect{LOWEST, LOWEST, HIGHEST, HIGHEST}));
}

TEST(PixelRegion, MovesAsAWhole) {
    PixelRegion region = RegionOf({{0, 0, 4, 4}, {6, 6, 8, 8}});
    region.Translate(-3, 100);
    EXPECT_EQ(region.Rects(), (Rects{{-3, 100, 1, 104}, {3, 106, 5, 108}}));
}

TEST(PixelRegion, CopiesAreIndependent) {
    PixelRegion region = RegionOf({{0, 0, 4, 4}, {6, 6, 8, 8}});
    const PixelRegion copy = region;
    region.Subtract({0, 0, 4, 4});
    EXPECT_EQ(copy.Rects().size(), 2u);
    PixelRegion assigned;
    assigned = copy;
    assigned.Clear();
    EXPECT_EQ(copy.Rects().size(), 2u);
    PixelRegion moved = std::move(region);
    EXPECT_EQ(moved, PixelRegion({6, 6, 8, 8}));
    region = copy; // what was moved from can be given a new value
    EXPECT_EQ(region, copy);
}

TEST(PixelRegion, EqualsWhatCoversTheSame) {
    EXPECT_EQ(RegionOf({{0, 0, 4, 4}, {4, 0, 8, 4}}), PixelRegion({0, 0, 8, 4}));
    EXPECT_FALSE(RegionOf({{0, 0, 4, 4}}) == PixelRegion({0, 0, 4, 5}));
}

class RandomRegions {
public:
    explicit RandomRegions(unsigned seed) : m_random(seed) {}

    int Number(int last) { return std::uniform_int_distribution<int>(0, last)(m_random); }
    PixelRect Rect() {
        const int left = Number(SIDE), top = Number(SIDE);
        return {left, top, Number(SIDE), Number(SIDE)};
    }
    PixelRegion Region() {
        PixelRegion region;
        for (int count = Number(4); count >= 0; --count)
            region.Add(Rect());
        return region;
    }

private:
    std::mt19937 m_random;
};

TEST(PixelRegion, DoesWhatSetsOfPixelsDo) {
    const int count = 20'000 * TestEffort();
    constexpr unsigned SEED = 4711;
    std::cout << count << " steps, seed " << SEED << "\n";
    RandomRegions random(SEED);
    PixelRegion region;
    Pixels pixels;
    for (int step = 0; step < count; ++step) {
        const PixelRegion other = random.Region();
        const PixelRect rect = random.Rect();
        switch (random.Number(5)) {
            case 0:
                region.Add(other);
                pixels |= PixelsOf(other);
                break;
            case 1:
                region.Subtract(other);
                pixels &= ~PixelsOf(other);
                break;
            case 2:
                region.Intersect(other);
                pixels &= PixelsOf(other);
                break;
            case 3:
                region.Add(rect);
                pixels |= PixelsOf(rect);
                break;
            case 4:
                region.Subtract(rect);
                pixels &= ~PixelsOf(rect);
                break;
            default:
                region.Intersect(rect);
                pixels &= PixelsOf(rect);
                break;
        }
        ASSERT_EQ(PixelsOf(region), pixels) << "step " << step;
        ASSERT_EQ(region.IsEmpty(), pixels.none());
        const int x = random.Number(SIDE - 1), y = random.Number(SIDE - 1);
        ASSERT_EQ(region.Contains(x, y), pixels.test(PlaceOf(x, y)));
    }
}

} // namespace
