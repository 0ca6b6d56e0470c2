// SPDX-License-Identifier: Apache-2.0
#include "tests/security/fault_bench.h"

#include <gtest/gtest.h>

// All displays go and come back, or the window server does, in every mode.

namespace {

class DisplaysGone : public testing::TestWithParam<FaultKind> {
protected:
    void SetUp() override {
        bench.Start();
        ASSERT_TRUE(bench.ShowsText());
    }

    void RemoveDisplays() {
        EXPECT_TRUE(bench.desktop->RemoveDisplay(FaultBench::SIDE));
        EXPECT_TRUE(bench.desktop->RemoveDisplay(FaultBench::MAIN));
        EXPECT_TRUE(bench.desktop->GetDisplays()->empty());
    }
    /// The same ones, in any order.
    void PutDisplaysBack(bool mainFirst) {
        const std::vector<platform::SimulatedDisplay> displays = FaultBench::Desk().Build().displays;
        bench.desktop->Change([&](platform::SimulatedDesktop& desktop) { desktop.displays = displays; });
        if (!mainFirst)
            return;
        EXPECT_TRUE(bench.desktop->SetMainDisplay(FaultBench::MAIN));
    }
    void TickWithNothing() {
        for (int i = 0; i < 30; ++i) // longer than a mode may fail
            bench.Tick();
        EXPECT_EQ(bench.client->GetCaptureStatus(), SHARE_CAPTURE_ENGINE_STATUS_STARTED);
    }
    void ExpectToBeRightAgain() {
        bench.AwaitNotices();
        EXPECT_TRUE(bench.ShowsText());
        EXPECT_EQ(bench.RedSoFar(), 0);
        EXPECT_EQ(bench.client.Statistic().eCaptureMode, GetParam().mode) << "it has fallen back";
    }

    FaultBench bench{GetParam()};
};

INSTANTIATE_TEST_SUITE_P(Kinds, DisplaysGone, FaultKinds(),
                         [](const auto& each) { return NameOf(each.param); });

} // namespace

TEST_P(DisplaysGone, AreSharedAgainWhenTheyAreBack) {
    for (int round = 0; round < 2; ++round) {
        bench.client.sink.Clear();
        RemoveDisplays();
        ASSERT_TRUE(bench.client.sink.WaitForNotice("error -203")) << "round " << round;
        TickWithNothing();
        PutDisplaysBack(round % 2 == 0);
        ExpectToBeRightAgain();
    }
}

TEST_P(DisplaysGone, AreSharedAgainWhenTheWindowServerIsBack) {
    for (int round = 0; round < 2; ++round) {
        bench.desktop->Lose();
        TickWithNothing();
        bench.desktop->FindAgain();
        ExpectToBeRightAgain();
    }
}
