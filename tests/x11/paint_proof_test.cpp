// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/paint_proof.h"

#include <gtest/gtest.h>

#include <vector>

namespace {

using namespace platform;
using namespace platform::x11;
using namespace std::chrono_literals;
using Nudge = PaintProof::Nudge;

constexpr PixelRect ALL{0, 0, 100, 50};
constexpr PixelRect LEFT{0, 0, 60, 50};
constexpr PixelRect RIGHT{60, 0, 100, 50};

DamageReport Report(const PixelRect& rect, bool more = false, unsigned sequence = 10) {
    return {rect, more, sequence};
}

PaintProof Unwatched() {
    PaintProof proof;
    proof.Renew({100, 50}, false, 0ns);
    proof.CountFrom(10);
    return proof;
}

PaintProof Watched() {
    PaintProof proof;
    proof.CountFrom(5);
    proof.Renew({100, 50}, true, 0ns);
    return proof;
}

TEST(PaintProof, BelievesNothingAtFirst) {
    const PaintProof proof = Watched();
    EXPECT_FALSE(proof.IsProven());
    EXPECT_EQ(proof.Unproven(), PixelRegion(ALL));
}

TEST(PaintProof, TakesTheFirstReportOfAWatchedWindowForItsAppearance) {
    PaintProof proof = Watched();
    proof.OnDamage(Report(ALL));
    proof.Confirm(11);
    EXPECT_EQ(proof.Unproven(), PixelRegion(ALL));
    proof.OnDamage(Report(ALL));
    proof.Confirm(11);
    EXPECT_TRUE(proof.IsProven());
}

TEST(PaintProof, TakesAReportOfSeveralRectanglesForOne) {
    PaintProof proof = Watched();
    proof.OnDamage(Report(LEFT, true));
    proof.OnDamage(Report(RIGHT));
    proof.Confirm(11);
    EXPECT_EQ(proof.Unproven(), PixelRegion(ALL));
    proof.OnDamage(Report(LEFT, true));
    proof.OnDamage(Report(RIGHT));
    proof.Confirm(11);
    EXPECT_TRUE(proof.IsProven());
}

TEST(PaintProof, BelievesEachReportToOneWhoCameLate) {
    PaintProof proof = Unwatched();
    proof.OnDamage(Report(LEFT));
    proof.Confirm(11);
    EXPECT_EQ(proof.Unproven(), PixelRegion(RIGHT));
    proof.OnDamage(Report({50, 0, 100, 25}));
    proof.Confirm(11);
    EXPECT_EQ(proof.Unproven(), PixelRegion(PixelRect{60, 25, 100, 50}));
    proof.OnDamage(Report(ALL));
    proof.Confirm(11);
    EXPECT_TRUE(proof.IsProven());
}

TEST(PaintProof, DoesNotBelieveWhatTheWatchBeginsWith) {
    PaintProof proof = Unwatched();
    proof.OnDamage(Report(ALL, false, 9));
    proof.Confirm(20);
    EXPECT_EQ(proof.Unproven(), PixelRegion(ALL));
}

TEST(PaintProof, BelievesAReportOnlyWhenNothingMoreCanComeWithItsNumber) {
    PaintProof proof = Unwatched();
    proof.OnDamage(Report(LEFT, false, 10));
    EXPECT_TRUE(proof.IsAnythingUnconfirmed());
    proof.Confirm(10);
    EXPECT_EQ(proof.Unproven(), PixelRegion(ALL));
    proof.OnDamage(Report(RIGHT, false, 11)); // with which all of 10 is here
    EXPECT_EQ(proof.Unproven(), PixelRegion(RIGHT));
    EXPECT_TRUE(proof.IsAnythingUnconfirmed());
    proof.Confirm(12);
    EXPECT_TRUE(proof.IsProven());
    EXPECT_FALSE(proof.IsAnythingUnconfirmed());
}

TEST(PaintProof, LosesWhatIsMovedOverAPaintingThatIsNotBelievedYet) {
    PaintProof proof = Unwatched();
    proof.OnDamage(Report(LEFT, false, 10));
    proof.OnRearrangedInside(11, true);
    proof.OnDamage(Report({0, 0, 10, 10}, false, 11));
    proof.Confirm(12);
    PixelRegion rest(RIGHT);
    rest.Add(PixelRect{0, 0, 10, 10});
    EXPECT_EQ(proof.Unproven(), rest);
}

TEST(PaintProof, DoesNotBelieveWhatHasTheNumberOfARearrangement) {
    PaintProof proof = Unwatched();
    proof.OnDamage(Report({0, 0, 10, 10}, false, 10));
    proof.OnDamage(Report(LEFT, false, 11)); // before the event
    proof.OnRearranged(11);
    proof.OnDamage(Report(RIGHT, false, 11)); // after it
    proof.OnDamage(Report({90, 40, 100, 50}, false, 12));
    proof.Confirm(13);
    PixelRegion rest(ALL);
    rest.Subtract(PixelRect{0, 0, 10, 10});
    rest.Subtract(PixelRect{90, 40, 100, 50});
    EXPECT_EQ(proof.Unproven(), rest);
}

TEST(PaintProof, TakesWhatReachesTheBorderForThat) {
    PaintProof proof;
    proof.Renew({100, 50, 3}, false, 0ns);
    proof.CountFrom(10);
    proof.OnDamage(Report(ALL));
    proof.Confirm(11);
    EXPECT_EQ(proof.Unproven(), PixelRegion(PixelRect{3, 3, 97, 47}));
    proof.OnDamage(Report({3, 3, 97, 47}));
    proof.Confirm(11);
    EXPECT_TRUE(proof.IsProven());
}

TEST(PaintProof, LosesWhatWasMovedInsideUpToTheBorder) {
    PaintProof proof;
    proof.Renew({100, 50, 3}, false, 0ns);
    proof.CountFrom(10);
    proof.OnDamage(Report({3, 3, 97, 30}));
    proof.Confirm(11);
    proof.OnRearrangedInside(12, true);
    proof.OnDamage(Report({20, 20, 99, 30}, false, 12));
    PixelRegion rest(ALL);
    rest.Subtract(PixelRect{3, 3, 97, 30});
    rest.Add(PixelRect{20, 20, 99, 30});
    EXPECT_EQ(proof.Unproven(), rest);
}

TEST(PaintProof, LosesWhatWasMovedInside) {
    PaintProof proof = Unwatched();
    proof.OnDamage(Report(LEFT, false, 10));
    proof.Confirm(11);
    proof.OnDamage(Report({0, 0, 10, 10}, false, 12)); // before the event
    proof.OnRearrangedInside(12, true);
    proof.OnDamage(Report({20, 20, 40, 400}, false, 12)); // after it
    proof.OnDamage(Report({25, 20, 30, 30}, false, 13));
    proof.Confirm(14);
    PixelRegion rest(RIGHT);
    rest.Add(PixelRect{0, 0, 10, 10});
    rest.Add(PixelRect{20, 20, 40, 50});
    rest.Subtract(PixelRect{25, 20, 30, 30});
    EXPECT_EQ(proof.Unproven(), rest);
}

TEST(PaintProof, LosesAllWhenItIsNotToldWhatWasMovedInside) {
    PaintProof proof = Unwatched();
    proof.OnDamage(Report(LEFT, false, 10));
    proof.Confirm(11);
    proof.OnRearrangedInside(12, false);
    EXPECT_EQ(proof.Unproven(), PixelRegion(ALL));
}

TEST(PaintProof, LosesNothingByMovesInsideWhenAllIsItsOwn) {
    PaintProof proof = Unwatched();
    proof.OnDamage(Report(ALL, false, 10));
    proof.Confirm(11);
    proof.OnRearrangedInside(12, true);
    proof.OnDamage(Report(ALL, false, 12));
    EXPECT_TRUE(proof.IsProven());
}

TEST(PaintProof, KnowsThatNumbersWrapAround) {
    PaintProof proof;
    proof.Renew({100, 50}, false, 0ns);
    proof.CountFrom(0xFFFFFFF0U);
    proof.OnDamage(Report(LEFT, false, 0xFFFFFFFFU));
    proof.OnDamage(Report(RIGHT, false, 2));
    proof.OnRearranged(2);
    proof.Confirm(3);
    EXPECT_EQ(proof.Unproven(), PixelRegion(RIGHT));
}

TEST(PaintProof, ForgetsWhatWasProvenWhenTheStorageIsRenewed) {
    PaintProof proof;
    proof.Renew({100, 50}, false, 0ns);
    proof.OnDamage(Report(ALL));
    proof.Confirm(11);
    ASSERT_TRUE(proof.IsProven());
    proof.OnDamage(Report(ALL)); // which has nothing to do with the new one
    proof.Renew({40, 30}, false, 0ns);
    proof.Confirm(11);
    EXPECT_EQ(proof.Unproven(), PixelRegion(PixelRect{0, 0, 40, 30}));
}

TEST(PaintProof, TrustsAllButWhatIsCovered) {
    PaintProof proof;
    proof.Trust({100, 50}, PixelRegion(PixelRect{60, -10, 400, 400}), 0ns);
    EXPECT_EQ(proof.Unproven(), PixelRegion(RIGHT));
    proof.OnDamage(Report(RIGHT)); // of a background: nothing has appeared
    proof.Confirm(11);
    EXPECT_TRUE(proof.IsProven());
    proof.Trust({100, 50}, PixelRegion(), 0ns);
    EXPECT_TRUE(proof.IsProven());
}

TEST(PaintProof, NudgesWithForceWhenAWordIsNotEnoughAndWithAWordEverMoreRarelyAfterwards) {
    PaintProof proof;
    proof.Renew({100, 50}, false, 10s);
    std::vector<std::chrono::nanoseconds> times;
    std::vector<Nudge> nudges;
    while (times.size() < 9) {
        const auto time = proof.NextNudge();
        ASSERT_TRUE(time);
        times.push_back(*time - 10s);
        nudges.push_back(proof.TakeNudge(*time));
    }
    EXPECT_EQ(times, (std::vector<std::chrono::nanoseconds>{40ms, 200ms, 500ms, 1s, 3s, 7s, 17s, 27s, 37s}));
    std::vector<Nudge> expected(9, Nudge::TellExposure);
    expected[2] = expected[3] = Nudge::ClearAndExpose;
    EXPECT_EQ(nudges, expected);
}

TEST(PaintProof, DoesNotHurryAfterANudgeThatCameLate) {
    PaintProof proof;
    proof.Renew({100, 50}, false, 0s);
    proof.TakeNudge(9s);
    ASSERT_TRUE(proof.NextNudge());
    EXPECT_EQ(*proof.NextNudge(), 9s + 160ms);
}

TEST(PaintProof, NudgesNobodyWhoseWindowIsProven) {
    PaintProof proof;
    proof.Renew({100, 50}, false, 0s);
    ASSERT_TRUE(proof.NextNudge());
    proof.OnDamage(Report(ALL));
    proof.Confirm(11);
    EXPECT_FALSE(proof.NextNudge());
}

TEST(PaintProof, BeginsNudgingAnewWhenItIsWantedAgain) {
    PaintProof proof;
    proof.Renew({100, 50}, false, 0s);
    for (int nudges = 0; nudges < 6; ++nudges)
        proof.TakeNudge(10s);
    proof.StartNudging(20s);
    ASSERT_TRUE(proof.NextNudge());
    EXPECT_EQ(*proof.NextNudge(), 20s + 40ms);
}

} // namespace
