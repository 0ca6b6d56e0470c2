// SPDX-License-Identifier: Apache-2.0
#include "tests/security/fault_bench.h"

#include <gtest/gtest.h>

#include <cstddef>

// The window server gives no pictures, or not each time it is asked for one.

using platform::SimulatedOperation;

namespace {

constexpr SimulatedOperation PICTURES[] = {SimulatedOperation::TakeWindowPicture,
                                           SimulatedOperation::TakeNewest};

class PicturesFail : public testing::TestWithParam<FaultKind> {
protected:
    void SetUp() override {
        bench.Start();
        ASSERT_TRUE(bench.ShowsText());
    }
    void Heal() {
        for (const SimulatedOperation operation : PICTURES)
            bench.desktop->Heal(operation);
    }

    FaultBench bench{GetParam()};
};

INSTANTIATE_TEST_SUITE_P(Kinds, PicturesFail, FaultKinds(),
                         [](const auto& each) { return NameOf(each.param); });

} // namespace

TEST_P(PicturesFail, NowAndThenAndTheOthersAreRight) {
    std::size_t frames = 0;
    for (unsigned i = 0; i < 30; ++i) {
        const std::size_t before = bench.client.sink.FrameCount();
        for (const SimulatedOperation operation : PICTURES) {
            if (i % 3 == 0)
                bench.desktop->FailNext(operation);
        }
        bench.Tick();
        frames += bench.client.sink.FrameCount() - before;
        EXPECT_EQ(bench.RedSoFar(), 0) << "tick " << i;
    }
    EXPECT_GT(frames, 5u);
    EXPECT_EQ(bench.client.Statistic().eCaptureMode, GetParam().mode)
        << "now and then is no reason to fall back";
    Heal();
    EXPECT_TRUE(bench.ShowsText());
    EXPECT_EQ(bench.RedSoFar(), 0);
}

TEST_P(PicturesFail, ForSecondsAndAreRightAfterwardsInWhicheverMode) {
    for (const SimulatedOperation operation : PICTURES)
        bench.desktop->FailAlways(operation);
    for (int i = 0; i < 35; ++i)
        bench.Tick();
    EXPECT_EQ(bench.client->GetCaptureStatus(), SHARE_CAPTURE_ENGINE_STATUS_STARTED);
    Heal();
    EXPECT_TRUE(bench.ShowsText());
    EXPECT_EQ(bench.RedSoFar(), 0);
}
