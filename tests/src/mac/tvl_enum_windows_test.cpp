// SPDX-License-Identifier: Apache-2.0
#include "platform/core_graphics.h"
#include "tests/support/engine_bench.h"
#include "tests/support/fake_window_server.h"

#include <screenshare/share_engine.h>

#include <gtest/gtest.h>

#include <cstddef>
#include <stdexcept>
#include <string>
#include <vector>

// The walk over the windows for a client's picker.

namespace {

using Ids = std::vector<unsigned>;

/// Keeps the windows that it hears of, and ends the walk after so many.
class CWindowsHeard : public ITvlEnumWindowsCallback {
public:
    bool OnWindow(unsigned window) override {
        windows.push_back(window);
        return windows.size() < limit;
    }
    Ids windows;
    std::size_t limit = 1000;
};

class TvlEnumWindowsWalk : public testing::Test {
protected:
    static constexpr unsigned DOCK = 1;
    static constexpr unsigned EDITOR = 2;
    static constexpr unsigned PRIVATE = 3;
    static constexpr unsigned MINIMISED = 4;
    static constexpr unsigned MAIL = 5;
    static constexpr unsigned WALLPAPER = 6;

    TvlEnumWindowsWalk() {
        const platform::CGRect frame{{0, 0}, {10, 10}};
        const int dockLevel = platform::CGWindowLevelForKey(platform::kCGDockWindowLevelKey);
        std::vector<platform::WindowInfo> windows = {FakeWindow(DOCK, 10, frame, dockLevel),
                                                     FakeWindow(EDITOR, 11, frame),
                                                     FakeWindow(PRIVATE, 12, frame),
                                                     FakeWindow(MINIMISED, 13, frame),
                                                     FakeWindow(MAIL, 14, frame),
                                                     FakeWindow(WALLPAPER, 15, frame, -20)};
        windows[2].sharing = platform::SharingState::None;
        windows[3].onScreen = false;
        server->SetWindows(windows);
    }

    static Ids WindowsOf(unsigned mode) {
        CWindowsHeard heard;
        EXPECT_EQ(TvlEnumWindows(&heard, mode), 0);
        return heard.windows;
    }

    CFakeWindowServerScope server;
};

} // namespace

TEST_F(TvlEnumWindowsWalk, LeavesOutTheDockTheDesktopAndWhatIsOffTheScreen) {
    EXPECT_EQ(WindowsOf(SHARE_WINDOW_ENUM_NORMAL), (Ids{EDITOR, MAIL}));
}

TEST_F(TvlEnumWindowsWalk, TellsOfTheDockWhenItIsAskedTo) {
    EXPECT_EQ(WindowsOf(SHARE_WINDOW_ENUM_ON_SCREEN), (Ids{DOCK, EDITOR, MAIL}));
}

TEST_F(TvlEnumWindowsWalk, TellsOfWindowsOffTheScreenInAnyHigherMode) {
    for (const unsigned mode : {2u, 7u, 0xFFFFFFFFu})
        EXPECT_EQ(WindowsOf(mode), (Ids{DOCK, EDITOR, MINIMISED, MAIL})) << mode;
}

TEST_F(TvlEnumWindowsWalk, EndsWhenTheCallbackHasHadEnough) {
    CWindowsHeard heard;
    heard.limit = 1;
    EXPECT_EQ(TvlEnumWindows(&heard, 0), 0);
    EXPECT_EQ(heard.windows, Ids{EDITOR});
}

TEST_F(TvlEnumWindowsWalk, RefusesANullCallback) {
    const CTraceLog trace;
    for (const unsigned mode : {0u, 2u})
        EXPECT_EQ(TvlEnumWindows(nullptr, mode), -2);
    EXPECT_TRUE(trace.Lines().empty());
}

TEST_F(TvlEnumWindowsWalk, FindsNothingWithoutAWindowServer) {
    server->SetLife(platform::Life::Lost);
    EXPECT_EQ(WindowsOf(0), Ids{});
}

TEST_F(TvlEnumWindowsWalk, StopsAnExceptionOfTheCallback) {
    class CThrowing : public ITvlEnumWindowsCallback {
    public:
        bool OnWindow(unsigned) override { throw std::runtime_error("oops"); }
    };
    const CTraceLog trace;
    CThrowing callback;
    EXPECT_EQ(TvlEnumWindows(&callback, 0), -1);
    ASSERT_EQ(trace.Lines().size(), 1u);
    EXPECT_TRUE(
        IsLineAt(trace.Lines()[0], Error("[TvlEnumWindows]>>fail>>oops"), "src/mac/tvl_enum_windows"));
}
