// SPDX-License-Identifier: Apache-2.0
#include "tests/privacy/delivered_history.h"
#include "tests/support/test_effort.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdio>
#include <iterator>
#include <string>
#include <tuple>
#include <vector>

/// Shares before the privacy oracle, from the exported functions to the pixels that a client got: whatever
/// happens on the desktop and to the share, no frame shows what is kept out.

namespace {

constexpr unsigned FIRST_SEED = 73'000;
constexpr int HISTORIES = 120;
constexpr int STEPS = 60;

/// Each mode and each kind of share once, where a sanitizer makes all of them take too long.
std::vector<DeliveredKind> SessionKinds() {
    if (SCREENSHARE_TEST_SANITIZED != 0)
        return {DELIVERED_SESSION_KINDS[1], DELIVERED_SESSION_KINDS[2], DELIVERED_SESSION_KINDS[5]};
    return {std::begin(DELIVERED_SESSION_KINDS), std::end(DELIVERED_SESSION_KINDS)};
}

class DeliveredPrivacy : public testing::TestWithParam<DeliveredKind> {
protected:
    /// What follows its windows gives many times as many frames in a history.
    static int Histories() {
        constexpr int HISTORIES_OF_WINDOWS = 24;
        constexpr int HISTORIES_OF_SESSIONS = 5;
        if (GetParam().IsOfSession())
            return HISTORIES_OF_SESSIONS;
        return GetParam().IsOfDesktop() ? HISTORIES : HISTORIES_OF_WINDOWS;
    }
};

std::string NameOf(const testing::TestParamInfo<DeliveredKind>& each) {
    return each.param.name;
}

std::string NameOfWrong(const testing::TestParamInfo<std::tuple<DeliveredKind, DeliveredFault>>& each) {
    return std::string(std::get<0>(each.param).name) + testing::PrintToString(std::get<1>(each.param));
}

class WrongDelivery : public testing::TestWithParam<std::tuple<DeliveredKind, DeliveredFault>> {};

} // namespace

TEST_P(DeliveredPrivacy, NoFrameOfAnyHistoryShowsWhatIsKeptOut) {
    const int histories = TestRounds(Histories());
    DeliveredCounts all;
    for (int i = 0; i < histories; ++i) {
        const unsigned seed = FIRST_SEED + static_cast<unsigned>(i);
        DeliveredHistory history(GetParam(), DeliveredFault::None, seed);
        for (int step = 0; step < STEPS; ++step) {
            history.Step();
            ASSERT_FALSE(IsLeak(GetParam(), history.Counts()) || IsDead(GetParam(), history.Counts()))
                << "seed " << seed << ", step " << step << ": " << ToString(history.Counts())
                << history.LastSteps();
        }
        all += history.End();
    }
    std::printf("%d histories of %d steps from seed %u on, %s\n", histories, STEPS, FIRST_SEED,
                ToString(all).c_str());
    EXPECT_GT(all.frames, histories * STEPS / 4);
    EXPECT_GT(all.findings.forbidden, 100L * all.frames);
    // One history, which is what a sanitizer has time for, may have hardly a frame that nothing disturbs.
    EXPECT_GT(all.framesForLife, histories > 1 ? all.frames / 25 : 0);
    EXPECT_GT(all.keptShown, 300L * all.framesForLife);
}

TEST_P(DeliveredPrivacy, AServerThatGivesMoreThanItIsAskedForIsNotBelieved) {
    DeliveredCounts all;
    for (int i = 0; i < TestRounds(Histories() / 4); ++i) {
        DeliveredHistory history(GetParam(), DeliveredFault::OneLayerTooMany,
                                 FIRST_SEED + static_cast<unsigned>(i));
        for (int step = 0; step < STEPS; ++step)
            history.Step();
        all += history.End();
    }
    EXPECT_FALSE(IsLeak(GetParam(), all)) << ToString(all);
    EXPECT_GT(all.findings.forbidden, 100L * all.frames);
}

INSTANTIATE_TEST_SUITE_P(Kinds, DeliveredPrivacy, testing::ValuesIn(DELIVERED_KINDS), NameOf);
INSTANTIATE_TEST_SUITE_P(Sessions, DeliveredPrivacy, testing::ValuesIn(SessionKinds()), NameOf);

TEST_P(WrongDelivery, IsNoticed) {
    if (SCREENSHARE_TEST_SANITIZED != 0)
        GTEST_SKIP() << "that the oracle notices it is shown without a sanitizer";
    const auto& [kind, fault] = GetParam();
    for (int i = 0; i < HISTORIES; ++i) {
        DeliveredHistory history(kind, fault, FIRST_SEED + static_cast<unsigned>(i));
        for (int step = 0; step < STEPS; ++step) {
            history.Step();
            DeliveredCounts counts = history.Counts();
            counts.thumbnails = {}; // frames alone have to show it
            if (HidesWhatIsKept(fault) ? IsDead(kind, counts) : IsLeak(kind, counts)) {
                std::printf("noticed in history %d at step %d: %s\n", i + 1, step + 1,
                            ToString(counts).c_str());
                return;
            }
        }
    }
    FAIL() << "it went unnoticed in " << HISTORIES << " histories";
}

INSTANTIATE_TEST_SUITE_P(
    EachFault, WrongDelivery,
    testing::Combine(testing::ValuesIn(DELIVERED_KINDS),
                     testing::Values(DeliveredFault::OneWindowTooMany, DeliveredFault::UnsharedShown,
                                     DeliveredFault::OldPixelsKept, DeliveredFault::WrongRectangle,
                                     DeliveredFault::ExclusionForgotten, DeliveredFault::ExclusionTooLate,
                                     DeliveredFault::NothingShown)),
    NameOfWrong);

INSTANTIATE_TEST_SUITE_P(EachFaultOfSessions, WrongDelivery,
                         testing::Combine(testing::ValuesIn(DELIVERED_SESSION_KINDS),
                                          testing::Values(DeliveredFault::StacksNotTold,
                                                          DeliveredFault::ExclusionForgotten)),
                         NameOfWrong);

INSTANTIATE_TEST_SUITE_P(DeadSessions, WrongDelivery,
                         testing::Combine(testing::Values(DELIVERED_SESSION_KINDS[0],
                                                          DELIVERED_SESSION_KINDS[1]),
                                          testing::Values(DeliveredFault::NothingShown)),
                         NameOfWrong);

TEST(WrongThumbnails, AreNoticed) {
    for (const DeliveredFault fault : {DeliveredFault::UnsharedShown, DeliveredFault::OldPixelsKept}) {
        ThumbnailFindings findings;
        for (unsigned i = 0; i < 20 && !findings.IsLeak(); ++i) {
            DeliveredHistory history(DELIVERED_KINDS[0], fault, FIRST_SEED + i);
            for (int step = 0; step < STEPS; ++step)
                history.Step();
            findings += history.Counts().thumbnails;
        }
        EXPECT_TRUE(findings.IsLeak()) << testing::PrintToString(fault) << ": " << ToString(findings);
    }
}
