// SPDX-License-Identifier: Apache-2.0
#include "src/share_region.h"

#include "tests/src/share_region_tools.h"

#include <gtest/gtest.h>

#include <limits>
#include <type_traits>
#include <utility>

namespace {

constexpr int kLowest = std::numeric_limits<int>::min();
constexpr int kHighest = std::numeric_limits<int>::max();
constexpr TVLRect kTouched{1, 2, 3, 4};

TVLRect BoxOf(const TVLRegion& region) {
    TVLRect box = kTouched;
    EXPECT_TRUE(region.GetRgnBox(box));
    return box;
}

TVLRegion Combined(const Rects& left, const Rects& right, RegionCombinOpt option) {
    TVLRegion region = Region(left);
    EXPECT_TRUE(region.CombineRgn(Region(right), option));
    return region;
}

Rects Projected(const TVLRect& rect, const TVLRect& origin, float scale) {
    TVLRegion region = Region({rect});
    EXPECT_TRUE(region.ProjectRgn(origin, scale));
    return RectsOf(region);
}

TEST(TVLRegion, IsNoMoreThanTheHandleOfItsShape) {
    EXPECT_EQ(sizeof(TVLRegion), sizeof(void*));
}

TEST(TVLRegion, SaysWhetherACopyWasMadeAndGivesItselfAfterAMove) {
    static_assert(
        std::is_same_v<decltype(std::declval<TVLRegion&>() = std::declval<const TVLRegion&>()), bool>);
    static_assert(
        std::is_same_v<decltype(std::declval<TVLRegion&>() = std::declval<TVLRegion>()), TVLRegion&>);
}

TEST(TVLRegion, NumbersTheWaysToCombine) {
    EXPECT_EQ(REGION_COMBINE_AND, 1);
    EXPECT_EQ(REGION_COMBINE_COPY, 2);
    EXPECT_EQ(REGION_COMBINE_DIFF, 3);
    EXPECT_EQ(REGION_COMBINE_OR, 4);
    EXPECT_EQ(REGION_COMBINE_XOR, 5);
}

TEST(TVLRegion, IsEmptyWhenMade) {
    const TVLRegion region;
    EXPECT_TRUE(region.IsEmpty());
    EXPECT_EQ(RectsOf(region), Rects{});
}

TEST(TVLRegion, SetToZerosIsEmpty) {
    TVLRegion region = Region({{1, 2, 30, 40}});
    EXPECT_TRUE(region.SetRectRgn(0, 0, 0, 0));
    EXPECT_TRUE(region.IsEmpty());
    EXPECT_EQ(RectsOf(region), Rects{});
}

TEST(TVLRegion, SetToARectangleForgetsWhatItWas) {
    TVLRegion region = Region({{1, 2, 30, 40}, {50, 60, 70, 80}});
    EXPECT_TRUE(region.SetRectRgn(-7, -8, 9, 10));
    EXPECT_EQ(RectsOf(region), (Rects{{-7, -8, 9, 10}}));
}

TEST(TVLRegion, IsLeftAsItWasByARectangleWithoutWidthOrHeight) {
    const Rects before{{0, 0, 10, 10}};
    for (const TVLRect& rect :
         Rects{{20, 20, 20, 30}, {20, 20, 30, 20}, {5, 5, 5, 5}, {30, 20, 25, 40}, {20, 40, 30, 20}}) {
        SCOPED_TRACE(testing::PrintToString(rect));
        TVLRegion region = Region(before);
        EXPECT_TRUE(region.AddRect(rect));
        EXPECT_EQ(RectsOf(region), before);
        EXPECT_TRUE(region.ExcludeRect(rect));
        EXPECT_EQ(RectsOf(region), before);
    }
}

TEST(TVLRegion, LosesWhatIsExcluded) {
    TVLRegion region = Region({{0, 0, 9, 9}});
    EXPECT_TRUE(region.ExcludeRect({3, 3, 6, 6}));
    EXPECT_EQ(RectsOf(region), (Rects{{0, 0, 9, 3}, {0, 3, 3, 6}, {6, 3, 9, 6}, {0, 6, 9, 9}}));
    EXPECT_TRUE(region.ExcludeRect({-5, -5, 50, 50}));
    EXPECT_TRUE(region.IsEmpty());
}

TEST(TVLRegion, HasTheSmallestRectangleAroundItAsBox) {
    EXPECT_EQ(BoxOf(Region({{3, -9, 5, -7}, {-4, 10, -3, 15}})), (TVLRect{-4, -9, 5, 15}));
}

TEST(TVLRegion, HasZerosAsBoxWhenEmptyWhateverItWas) {
    EXPECT_EQ(BoxOf(TVLRegion()), (TVLRect{0, 0, 0, 0}));
    TVLRegion emptied = Region({{5, 6, 7, 8}, {50, 60, 70, 80}});
    emptied.Empty();
    EXPECT_EQ(BoxOf(emptied), (TVLRect{0, 0, 0, 0}));
    EXPECT_EQ(BoxOf(Combined({{5, 6, 7, 8}}, {{50, 60, 70, 80}}, REGION_COMBINE_AND)), (TVLRect{0, 0, 0, 0}));
    EXPECT_EQ(BoxOf(Combined({{5, 6, 7, 8}}, {{0, 0, 70, 80}}, REGION_COMBINE_DIFF)), (TVLRect{0, 0, 0, 0}));
}

TEST(TVLRegion, CombinesAsEachOptionSays) {
    const Rects left{{0, 0, 4, 4}};
    const Rects right{{2, 0, 6, 4}};
    EXPECT_EQ(RectsOf(Combined(left, right, REGION_COMBINE_AND)), (Rects{{2, 0, 4, 4}}));
    EXPECT_EQ(RectsOf(Combined(left, right, REGION_COMBINE_COPY)), right);
    EXPECT_EQ(RectsOf(Combined(left, right, REGION_COMBINE_DIFF)), (Rects{{0, 0, 2, 4}}));
    EXPECT_EQ(RectsOf(Combined(left, right, REGION_COMBINE_OR)), (Rects{{0, 0, 6, 4}}));
    EXPECT_EQ(RectsOf(Combined(left, right, REGION_COMBINE_XOR)), (Rects{{0, 0, 2, 4}, {4, 0, 6, 4}}));
}

TEST(TVLRegion, RefusesAnOptionThatHasNoName) {
    const Rects before{{0, 0, 4, 4}};
    for (const int option : {-1, 0, 6, kHighest}) {
        TVLRegion region = Region(before);
        EXPECT_FALSE(region.CombineRgn(Region({{2, 0, 6, 4}}), static_cast<RegionCombinOpt>(option)));
        EXPECT_EQ(RectsOf(region), before);
    }
}

TEST(TVLRegion, CombinesWithItself) {
    const Rects rects{{0, 0, 4, 4}, {10, 20, 30, 40}};
    for (const RegionCombinOpt option : kEveryOption) {
        TVLRegion region = Region(rects);
        EXPECT_TRUE(region.CombineRgn(region, option));
        const bool isNothingLeft = option == REGION_COMBINE_DIFF || option == REGION_COMBINE_XOR;
        EXPECT_EQ(RectsOf(region), isNothingLeft ? Rects{} : rects) << option;
    }
}

TEST(TVLRegion, LeavesTheOtherAloneWhenItCombines) {
    const Rects rects{{2, 0, 6, 4}, {8, 8, 9, 9}};
    for (const RegionCombinOpt option : kEveryOption) {
        const TVLRegion other = Region(rects);
        TVLRegion region = Region({{0, 0, 4, 4}});
        EXPECT_TRUE(region.CombineRgn(other, option));
        EXPECT_TRUE(region.ExcludeRect({0, 0, 99, 99}));
        EXPECT_EQ(RectsOf(other), rects);
    }
}

TEST(TVLRegion, IsIndependentOfWhatItCopied) {
    const TVLRegion original = Region({{0, 0, 4, 4}, {10, 20, 30, 40}});
    TVLRegion copy;
    EXPECT_TRUE(copy.CopyRgn(original));
    EXPECT_TRUE(copy == original);
    copy.Empty();
    EXPECT_FALSE(original.IsEmpty());
    EXPECT_TRUE((copy = original));
    EXPECT_TRUE(copy == original);
}

TEST(TVLRegion, SurvivesACopyOfItself) {
    TVLRegion region = Region({{0, 0, 4, 4}});
    const TVLRegion& same = region;
    EXPECT_TRUE(region.CopyRgn(same));
    EXPECT_TRUE((region = same));
    EXPECT_EQ(RectsOf(region), (Rects{{0, 0, 4, 4}}));
}

TEST(TVLRegion, EqualsWhatCoversTheSamePixels) {
    const TVLRegion whole = Region({{0, 0, 8, 8}});
    EXPECT_TRUE(Region({{0, 0, 4, 8}, {4, 0, 8, 3}, {3, 2, 8, 8}}) == whole);
    EXPECT_FALSE(Region({{0, 0, 8, 7}}) == whole);
    EXPECT_FALSE(whole == Region({{0, 0, 8, 7}}));
    EXPECT_FALSE(whole == Region({{0, 0, 8, 8}, {9, 9, 10, 10}}));
    EXPECT_FALSE(whole == TVLRegion());
    EXPECT_FALSE(TVLRegion() == whole);
    EXPECT_TRUE(TVLRegion() == TVLRegion());
}

TEST(TVLRegion, AppendsItsRectangles) {
    Rects rects{{9, 9, 8, 8}, {7, 7, 6, 6}};
    EXPECT_TRUE(Region({{0, 5, 1, 6}, {0, 0, 1, 1}}).GetRects(rects));
    EXPECT_EQ(rects, (Rects{{9, 9, 8, 8}, {7, 7, 6, 6}, {0, 0, 1, 1}, {0, 5, 1, 6}}));
}

TEST(TVLRegion, GivesItsRectanglesFromTheTopAndFromTheLeft) {
    const TVLRegion region = Region({{20, 0, 30, 10}, {0, 5, 10, 15}, {40, 5, 50, 15}});
    EXPECT_EQ(RectsOf(region), (Rects{{20, 0, 30, 5},
                                      {0, 5, 10, 10},
                                      {20, 5, 30, 10},
                                      {40, 5, 50, 10},
                                      {0, 10, 10, 15},
                                      {40, 10, 50, 15}}));
}

// NOLINTBEGIN(bugprone-use-after-move,clang-analyzer-cplusplus.Move): that is what is tested.
TEST(TVLRegion, LeavesWhatWasMovedFromEmptyAndUsable) {
    TVLRegion source = Region({{0, 0, 4, 4}});
    TVLRegion made(std::move(source));
    EXPECT_EQ(RectsOf(made), (Rects{{0, 0, 4, 4}}));
    EXPECT_TRUE(source.IsEmpty());
    EXPECT_TRUE(source.AddRect({5, 5, 6, 6}));

    TVLRegion assigned = Region({{70, 70, 80, 80}});
    EXPECT_EQ(&(assigned = std::move(source)), &assigned);
    EXPECT_EQ(RectsOf(assigned), (Rects{{5, 5, 6, 6}}));
    EXPECT_TRUE(source.IsEmpty());
    EXPECT_TRUE(source.AddRect({7, 7, 8, 8}));
    EXPECT_EQ(RectsOf(source), (Rects{{7, 7, 8, 8}}));
}

TEST(TVLRegion, SurvivesAMoveToItself) {
    TVLRegion region = Region({{0, 0, 4, 4}});
    TVLRegion& same = region;
    EXPECT_EQ(&(region = std::move(same)), &region);
    EXPECT_EQ(RectsOf(region), (Rects{{0, 0, 4, 4}}));
}
// NOLINTEND(bugprone-use-after-move,clang-analyzer-cplusplus.Move)

TEST(TVLRegion, LosesTheLastDigitsBeyondTwentyFourBits) {
    const TVLRegion region = Region({{16777217, -16777219, 16777219, -16777217}});
    EXPECT_EQ(RectsOf(region), (Rects{{16777216, -16777220, 16777218, -16777218}}));
    EXPECT_EQ(BoxOf(region), (TVLRect{16777216, -16777220, 16777218, -16777218}));
}

TEST(TVLRegion, HoldsTheLargestRectangleWhoseWidthFits) {
    EXPECT_EQ(RectsOf(Region({{0, 0, kHighest, kHighest}})), (Rects{{0, 0, kHighest, kHighest}}));
    EXPECT_EQ(RectsOf(Region({{kLowest, kLowest, -1, -1}})), (Rects{{kLowest, kLowest, 0, 0}}));
}

TEST(TVLRegion, CoversNothingWhereTheWidthDoesNotFit) {
    EXPECT_TRUE(Region({{kLowest, 0, kHighest, 1}}).IsEmpty());
    EXPECT_TRUE(Region({{0, -1, 1, kHighest}}).IsEmpty());
}

TEST(TVLRegion, IsProjectedByMovingAndScalingEachEdge) {
    EXPECT_EQ(Projected({101, 101, 103, 103}, {100, 100, 0, 0}, 0.5F), (Rects{{0, 0, 1, 1}}));
    EXPECT_EQ(Projected({10, 20, 30, 40}, {0, 0, 0, 0}, 2.0F), (Rects{{20, 40, 60, 80}}));
    EXPECT_EQ(Projected({10, 20, 30, 40}, {-5, 7, 0, 0}, 1.0F), (Rects{{15, 13, 35, 33}}));
}

TEST(TVLRegion, IsProjectedTowardZeroFromBothSides) {
    EXPECT_EQ(Projected({-3, -5, 3, 5}, {0, 0, 0, 0}, 0.5F), (Rects{{-1, -2, 1, 2}}));
}

TEST(TVLRegion, IsProjectedInSinglePrecision) {
    // 0.7F is a little less than seven tenths: an exact product would be cut to 6.
    EXPECT_EQ(Projected({0, 0, 10, 10}, {0, 0, 0, 0}, 0.7F), (Rects{{0, 0, 7, 7}}));
}

TEST(TVLRegion, LosesThinRectanglesWhenProjected) {
    EXPECT_EQ(Projected({10, 0, 11, 8}, {0, 0, 0, 0}, 0.25F), Rects{});
    EXPECT_EQ(Projected({3, 0, 4, 8}, {0, 0, 0, 0}, 0.25F), (Rects{{0, 0, 1, 2}}));
}

TEST(TVLRegion, ReadsOnlyTheCornerOfTheOriginWhenProjected) {
    EXPECT_EQ(Projected({10, 20, 30, 40}, {1, 2, 3, 4}, 0.5F),
              Projected({10, 20, 30, 40}, {1, 2, -70, -80}, 0.5F));
}

TEST(TVLRegion, JoinsWhatMeetsAfterTheProjection) {
    TVLRegion region = Region({{0, 0, 4, 4}, {5, 0, 8, 4}, {0, 5, 8, 8}});
    EXPECT_TRUE(region.ProjectRgn({0, 0, 0, 0}, 0.25F));
    EXPECT_EQ(RectsOf(region), (Rects{{0, 0, 2, 2}}));
}

TEST(TVLRegion, SurvivesAProjectionWithoutMeaning) {
    const TVLRect rect{10, 20, 30, 40};
    const TVLRect corner{0, 0, 0, 0};
    EXPECT_EQ(Projected(rect, corner, 0.0F), Rects{});
    EXPECT_EQ(Projected(rect, corner, -1.0F), Rects{});
    EXPECT_EQ(Projected(rect, corner, std::numeric_limits<float>::quiet_NaN()), Rects{});
    EXPECT_EQ(Projected(rect, corner, std::numeric_limits<float>::infinity()), Rects{});
    EXPECT_EQ(Projected(rect, {kLowest, kLowest, 0, 0}, 1e30F), Rects{});
    TVLRegion empty;
    EXPECT_TRUE(empty.ProjectRgn(corner, 0.5F));
    EXPECT_TRUE(empty.IsEmpty());
    EXPECT_TRUE(empty.AddRect(rect));
}

TEST(TVLRegion, SpellsItsRectanglesOut) {
    EXPECT_EQ(TVLRegion().ToString(), "{ region:{size:0,rects:[]}}");
    EXPECT_EQ(Region({{-1, 2, 30, 40}}).ToString(),
              "{ region:{size:1,rects:[{{left:-1,top:2,right:30,bottom:40,width:31,height:38}},\n]}}");
    EXPECT_EQ(Region({{0, 9, 1, 10}, {0, 0, 1, 1}}).ToString(),
              "{ region:{size:2,rects:[{{left:0,top:0,right:1,bottom:1,width:1,height:1}},\n"
              "{{left:0,top:9,right:1,bottom:10,width:1,height:1}},\n]}}");
}

} // namespace
