// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/fetch_plan.h"

#include <gtest/gtest.h>

#include <random>

namespace {

using namespace platform;
using namespace platform::x11;

TEST(FetchPlan, LeavesRectanglesAloneThatAreFarApart) {
    const std::vector<PixelRect> rects{{0, 0, 10, 10}, {900, 0, 910, 10}, {0, 500, 10, 510}};
    EXPECT_EQ(FewerRects(rects, 3), rects);
    EXPECT_TRUE(FewerRects({}, 3).empty());
}

TEST(FetchPlan, JoinsNeighboursWithLittleBetweenThem) {
    const std::vector<PixelRect> rects{{0, 0, 10, 10}, {20, 0, 30, 10}, {5, 12, 25, 20}};
    EXPECT_EQ(FewerRects(rects, 3), (std::vector<PixelRect>{{0, 0, 30, 20}}));
}

TEST(FetchPlan, CoversAllWithNoMoreThanItMay) {
    std::mt19937 random(1);
    for (int round = 0; round < 200; ++round) {
        PixelRegion region;
        for (unsigned i = 0; i < 1 + random() % 80; ++i) {
            const int left = static_cast<int>(random() % 1900);
            const int top = static_cast<int>(random() % 1000);
            region.Add(PixelRect{left, top, left + 1 + static_cast<int>(random() % 60),
                                 top + 1 + static_cast<int>(random() % 60)});
        }
        for (const std::size_t most : {std::size_t{1}, std::size_t{4}, std::size_t{16}}) {
            const std::vector<PixelRect> fewer = FewerRects(region.Rects(), most);
            EXPECT_LE(fewer.size(), most);
            PixelRegion missed = region;
            for (const PixelRect& rect : fewer)
                missed.Subtract(rect);
            EXPECT_TRUE(missed.IsEmpty());
        }
    }
}

} // namespace
