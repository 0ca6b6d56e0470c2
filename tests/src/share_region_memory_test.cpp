// SPDX-License-Identifier: Apache-2.0
#include "src/share_region.h"

#include "tests/src/share_region_tools.h"
#include "tests/support/memory_failure.h"

#include <gtest/gtest.h>

#include <string>
#include <utility>

namespace {

constexpr TVLRect kTouched{1, 2, 3, 4};

/// Has no shape, as after a copy for which there was no memory.
TVLRegion RegionWithoutShape() {
    TVLRegion region;
    const TVLRegion other;
    isMemoryGone = true;
    region.CopyRgn(other);
    isMemoryGone = false;
    return region;
}

TEST(TVLRegionWithoutShape, IsWhatAFailedConstructorLeaves) {
    isMemoryGone = true;
    TVLRegion region;
    isMemoryGone = false;
    EXPECT_TRUE(region.IsEmpty());
    EXPECT_FALSE(region.AddRect({0, 0, 1, 1}));
    region.Empty();
    EXPECT_TRUE(region.AddRect({0, 0, 1, 1}));
}

TEST(TVLRegionWithoutShape, PassesItOnWhenCopied) {
    const TVLRegion none = RegionWithoutShape();
    TVLRegion region = Region({{0, 0, 4, 4}});
    EXPECT_TRUE(region.CopyRgn(none));
    EXPECT_TRUE(region.IsEmpty());
    EXPECT_FALSE(region.AddRect({0, 0, 1, 1}));
    TVLRegion assigned = Region({{0, 0, 4, 4}});
    EXPECT_TRUE((assigned = none));
    EXPECT_FALSE(assigned.AddRect({0, 0, 1, 1}));
}

TEST(TVLRegionWithoutShape, RefusesToBeReadOrChanged) {
    TVLRegion none = RegionWithoutShape();
    Rects rects{kTouched};
    TVLRect box = kTouched;
    EXPECT_TRUE(none.IsEmpty());
    EXPECT_FALSE(none.AddRect({0, 0, 1, 1}));
    EXPECT_FALSE(none.ExcludeRect({0, 0, 1, 1}));
    EXPECT_FALSE(none.GetRects(rects));
    EXPECT_EQ(rects, Rects{kTouched});
    EXPECT_FALSE(none.GetRgnBox(box));
    EXPECT_EQ(box, kTouched);
    EXPECT_EQ(none.ToString(), "{ region:{size:0,rects:[]}}");
    EXPECT_TRUE(none.IsEmpty());
}

TEST(TVLRegionWithoutShape, CombinesOnNeitherSide) {
    const Rects before{{0, 0, 4, 4}};
    for (const RegionCombinOpt option : kEveryOption) {
        TVLRegion none = RegionWithoutShape();
        TVLRegion region = Region(before);
        EXPECT_FALSE(region.CombineRgn(none, option));
        EXPECT_EQ(RectsOf(region), before);
        EXPECT_FALSE(none.CombineRgn(region, option));
        EXPECT_FALSE(none.CombineRgn(none, option));
        EXPECT_FALSE(none.AddRect({0, 0, 1, 1}));
    }
}

TEST(TVLRegionWithoutShape, EqualsWhatIsEmpty) {
    const TVLRegion none = RegionWithoutShape();
    EXPECT_TRUE(none == TVLRegion());
    EXPECT_TRUE(TVLRegion() == none);
    EXPECT_TRUE(none == RegionWithoutShape());
    EXPECT_FALSE(none == Region({{0, 0, 1, 1}}));
    EXPECT_FALSE(Region({{0, 0, 1, 1}}) == none);
}

TEST(TVLRegionWithoutShape, IsHealedByWhateverGivesItAShape) {
    const TVLRect rect{0, 0, 1, 1};
    TVLRegion emptied = RegionWithoutShape();
    emptied.Empty();
    EXPECT_TRUE(emptied.AddRect(rect));

    TVLRegion set = RegionWithoutShape();
    EXPECT_TRUE(set.SetRectRgn(5, 6, 7, 8));
    EXPECT_EQ(RectsOf(set), (Rects{{5, 6, 7, 8}}));

    TVLRegion copied = RegionWithoutShape();
    EXPECT_TRUE(copied.CopyRgn(Region({rect})));
    EXPECT_EQ(RectsOf(copied), Rects{rect});

    TVLRegion projected = RegionWithoutShape();
    EXPECT_TRUE(projected.ProjectRgn({0, 0, 0, 0}, 0.5F));
    EXPECT_TRUE(projected.IsEmpty());
    EXPECT_TRUE(projected.AddRect(rect));

    TVLRegion moved = RegionWithoutShape();
    const TVLRegion taken(std::move(moved));
    EXPECT_TRUE(moved.AddRect(rect)); // NOLINT(bugprone-use-after-move,clang-analyzer-cplusplus.Move)
    Rects rects;
    EXPECT_FALSE(taken.GetRects(rects));
}

TEST(TVLRegionWithoutMemory, KeepsWhatItHadWhereItAnswersFalse) {
    const Rects before{{0, 0, 4, 4}, {10, 20, 30, 40}};
    TVLRegion region = Region(before);
    const TVLRegion other = Region({{2, 2, 20, 30}});
    Rects rects{kTouched};
    isMemoryGone = true;
    const bool isExcluded = region.ExcludeRect({0, 0, 2, 2});
    const bool isCopied = region.CombineRgn(other, REGION_COMBINE_COPY);
    const bool areRectsGiven = region.GetRects(rects);
    region.CopyRgn(static_cast<const TVLRegion&>(region));
    isMemoryGone = false;
    EXPECT_FALSE(isExcluded);
    EXPECT_FALSE(isCopied);
    EXPECT_FALSE(areRectsGiven);
    EXPECT_EQ(rects, Rects{kTouched});
    EXPECT_EQ(RectsOf(region), before);
}

TEST(TVLRegionWithoutMemory, AppendsAllItsRectanglesOrNone) {
    const TVLRegion region = Region({{0, 0, 4, 4}, {10, 20, 30, 40}, {50, 60, 70, 80}});
    Rects rects;
    rects.reserve(3);
    rects.push_back(kTouched);
    isMemoryGone = true;
    const bool areRectsGiven = region.GetRects(rects);
    isMemoryGone = false;
    EXPECT_FALSE(areRectsGiven);
    EXPECT_EQ(rects, Rects{kTouched});
}

TEST(TVLRegionWithoutMemory, ThrowsNothing) {
    TVLRegion region = Region({{0, 0, 4, 4}, {10, 20, 30, 40}});
    const TVLRegion same = Region({{0, 0, 4, 4}, {10, 20, 30, 40}});
    isMemoryGone = true;
    const bool isEqual = region == same;
    const std::string text = region.ToString();
    const bool isProjected = region.ProjectRgn({0, 0, 0, 0}, 0.5F);
    const TVLRegion made(std::move(region));
    region = TVLRegion();
    isMemoryGone = false;
    EXPECT_FALSE(isEqual);
    EXPECT_LT(text.size(), same.ToString().size());
    EXPECT_TRUE(isProjected);
    EXPECT_TRUE(made.IsEmpty());
    EXPECT_FALSE(region.AddRect({0, 0, 1, 1}));
}

} // namespace
