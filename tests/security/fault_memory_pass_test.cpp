// SPDX-License-Identifier: Apache-2.0
#include "tests/security/fault_bench.h"
#include "tests/support/test_effort.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <iostream>

// Memory runs out at one place of a pass after the other, on whichever thread of the library, and comes back.

namespace {

class PassesWithoutMemory : public testing::TestWithParam<FaultKind> {
protected:
    void SetUp() override {
        bench.Start();
        ASSERT_TRUE(bench.ShowsText());
        bench.Tick();
    }

    /// Frames that are right again. A mode that was left, or whose session has died, is told anew by the
    /// client, as one does that sees no frames come.
    [[nodiscard]] bool Recovers() {
        if (IsInMode() && bench.ShowsText())
            return true;
        ++toldAnew;
        bench.TellModeAnew();
        return bench.ShowsText();
    }
    bool IsInMode() const { return bench.client.Statistic().eCaptureMode == GetParam().mode; }

    FaultBench bench{GetParam()};
    int toldAnew = 0;
};

INSTANTIATE_TEST_SUITE_P(Kinds, PassesWithoutMemory, FaultKinds(),
                         [](const auto& each) { return NameOf(each.param); });

} // namespace

TEST_P(PassesWithoutMemory, ShowNothingWrongAndAreRightAfterwards) {
    const long asked = CountAllocations(Poor::Others, [this] { bench.Tick(); });
    ASSERT_GT(asked, 10) << "this counts nothing";
    const long stride = std::max(1L, asked / (20L * TestEffort()));
    int starved = 0;
    for (const Lack lack : {Lack::Once, Lack::Lasting}) {
        for (long allocations = 0; allocations < asked; allocations += stride) {
            CScarceMemory scarce(Poor::Others, lack, allocations);
            bench.Tick();
            starved += scarce.End() > 0 ? 1 : 0;
            ASSERT_TRUE(Recovers()) << "memory for " << allocations << (lack == Lack::Once ? " but one" : "");
            ASSERT_EQ(bench.RedSoFar(), 0) << "memory for " << allocations;
        }
    }
    std::cout << asked << " allocations in a pass, " << starved
              << " passes without one of them, mode told anew " << toldAnew << " times\n";
    EXPECT_GT(starved, 10);
    EXPECT_EQ(bench.client->GetCaptureStatus(), SHARE_CAPTURE_ENGINE_STATUS_STARTED);
}

TEST_P(PassesWithoutMemory, GoOnAfterSecondsWithoutAny) {
    CScarceMemory none(Poor::Others, Lack::Lasting, 0);
    for (int i = 0; i < 40; ++i)
        bench.Tick();
    EXPECT_GT(none.End(), 0);
    EXPECT_EQ(bench.RedSoFar(), 0);
    EXPECT_EQ(bench.client->GetCaptureStatus(), SHARE_CAPTURE_ENGINE_STATUS_STARTED);
    EXPECT_TRUE(Recovers());
    EXPECT_EQ(bench.RedSoFar(), 0);
}
