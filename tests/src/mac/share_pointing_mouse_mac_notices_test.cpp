// SPDX-License-Identifier: Apache-2.0
#include "tests/src/mac/share_pointing_mouse_mac_tools.h"
#include "tests/support/call_on_thread.h"
#include "tests/support/engine_bench.h"
#include "tests/support/test_effort.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <iostream>
#include <string>
#include <vector>

// The bounds that positions refer to, while displays change.

namespace {

using Lines = std::vector<std::string>;

const std::string LOOKED_UP = Debug("CSharePointingMouseMac::InitPointingContext()");

TEST_F(SharePointingMouseMac, TracesNoticesWhateverTheyTellAndWhoeverHears) {
    CSharePointingMouseMac mouse(MAIN);
    const CTraceLog trace;
    CSharePointingMouseMac::DisplayReconfigCallBack(MAIN, 33, nullptr);
    CSharePointingMouseMac::DisplayReconfigCallBack(MAIN, 0, &mouse);
    const std::string flag = "[CSharePointingMouseMac::_DisplayReconfigCallBack] flag=";
    EXPECT_EQ(trace.Lines(), (Lines{Info(flag + "33"), LOOKED_UP, Info(flag + "0")}));
}

TEST_F(SharePointingMouseMac, FollowsItsDisplayBeforeAndAfterEachChange) {
    const auto mouse = Polled(SIDE);
    const CTraceLog trace;
    server->MoveDisplay(SIDE, {1920, 200});
    ASSERT_TRUE(NoticesAreDelivered(*server));
    const Lines told = trace.LinesContaining("_DisplayReconfigCallBack] flag=");
    ASSERT_GE(told.size(), 2u);
    EXPECT_EQ(told[0], Info("[CSharePointingMouseMac::_DisplayReconfigCallBack] flag=1"));
    EXPECT_EQ(trace.LinesContaining("InitPointingContext").size(), told.size());
    EXPECT_EQ(PositionsAt(*mouse, 2000, 300), Lines{"80,100"});
}

TEST_F(SharePointingMouseMac, HearsNoNoticesAfterItsEnd) {
    auto ended = Polled(SIDE);
    const auto other = Polled(SIDE);
    const CTraceLog trace;
    server->MoveDisplay(SIDE, {1920, 100});
    ASSERT_TRUE(NoticesAreDelivered(*server));
    const std::size_t ofBoth = trace.CountContaining("flag=");
    ended.reset();
    server->MoveDisplay(SIDE, {1920, 200});
    ASSERT_TRUE(NoticesAreDelivered(*server));
    EXPECT_GE(ofBoth, 4u);
    EXPECT_EQ(2 * (trace.CountContaining("flag=") - ofBoth), ofBoth);
}

TEST_F(SharePointingMouseMac, KeepsTheBoundsOfTheDisplayThatItWasToldLastOverAnEarlierLookUp) {
    const auto mouse = Polled(MAIN);
    CTally inside;
    CGate gate;
    server->DoAt(platform::SimulatedOperation::GetDisplays, 1, [&] {
        inside.Add();
        EXPECT_TRUE(gate.Passes());
    });
    {
        CCallOnThread notice([&] { mouse->OnDisplayChanged(); });
        ASSERT_TRUE(inside.Reaches(1));
        CCallOnThread told([&] { mouse->SetBaseDisplayID(SIDE); });
        told.UntilItWaits();
        gate.Open();
    }
    EXPECT_EQ(PositionsAt(*mouse, 2000, 100), Lines{"80,100"});
}

TEST_F(SharePointingMouseMac, HasTheBoundsOfItsDisplayHoweverPollsAndNoticesMix) {
    const int rounds = TestRounds(200);
    std::cout << rounds << " rounds\n";
    const auto mouse = Polled(MAIN);
    for (int i = 0; i < rounds; ++i) {
        const bool isSide = i % 2 == 0;
        const float top = i % 4 < 2 ? 0.0F : 100.0F;
        server->MoveDisplay(SIDE, {1920, top + static_cast<float>(i % 3)}); // its notices come meanwhile
        server->MoveDisplay(SIDE, {1920, top});
        mouse->SetBaseDisplayID(isSide ? SIDE : MAIN);
        mouse->CapturePoint(SHARE_FRAME_FORMAT_RGBA);
        ASSERT_TRUE(NoticesAreDelivered(*server));
        ASSERT_EQ(PositionsAt(*mouse, isSide ? 2000.0F : 50.0F, 300),
                  Lines{isSide ? "80," + std::to_string(300 - static_cast<int>(top)) : "50,300"})
            << "round " << i;
    }
}

} // namespace
