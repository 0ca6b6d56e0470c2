// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_capturer_app_mac.h"
#include "src/mac/share_capturer_context_mac.h"
#include "src/mac/share_capturer_window_mac.h"
#include "tests/src/mac/busy_desk.h"
#include "tests/support/test_effort.h"
#include "tests/support/threads.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <functional>
#include <iostream>
#include <memory>
#include <thread>

// Captures of each kind from a desktop that never rests.

using namespace platform;
using namespace busy_desk;

namespace {

std::unique_ptr<CShareCapturerDesktopMac> OfADesktop(const std::shared_ptr<ShareCapturerContext>& context) {
    auto capturer = std::make_unique<CShareCapturerDesktopMac>(context);
    capturer->AddUnSharedProcess(static_cast<unsigned>(HIDDEN));
    capturer->SelectSharedDisplay(MAIN);
    return capturer;
}

std::unique_ptr<CShareCapturerDesktopMac> OfAnApplication(
    const std::shared_ptr<ShareCapturerContext>& context) {
    auto capturer = std::make_unique<CShareCapturerAppMac>(context);
    capturer->AddSharedProcess(static_cast<unsigned>(KEPT));
    return capturer;
}

std::unique_ptr<CShareCapturerDesktopMac> OfWindows(const std::shared_ptr<ShareCapturerContext>& context) {
    auto capturer = std::make_unique<CShareCapturerWindowMac>(context);
    for (CGWindowID window = 1; window <= WINDOWS + 1; ++window) {
        if (!IsHidden(window))
            capturer->AddSharedWindow(window);
    }
    return capturer;
}

using MakeCapturer = decltype(&OfADesktop);

/// Captures a desktop again and again while another thread changes it: so often, and then until enough was
/// seen, which is a matter of how the two threads meet.
Seen CaptureThroughUnrest(MakeCapturer make, const SimulatedLie* lie, int captures,
                          const std::function<bool(const Seen&)>& isEnough) {
    constexpr unsigned SEED = 4711;
    CManualClockScope clock;
    const CSettingsScope settings;
    const CServedScene desktop(BusyDesk());
    if (lie != nullptr)
        desktop->Lie(*lie);
    const auto capturer = make(std::make_shared<ShareCapturerContextMac>());

    std::atomic<bool> isOver{false};
    std::atomic<int> steps{0};
    std::thread other([&] {
        CUnrest unrest(*desktop.operator->(), SEED);
        for (; !isOver; ++steps)
            unrest.Step();
    });
    Seen seen;
    const FrameRef frame = NewFrameRef();
    int i = 0;
    const auto deadline = std::chrono::steady_clock::now() + PATIENCE;
    for (; i < captures || (!isEnough(seen) && std::chrono::steady_clock::now() < deadline); ++i) {
        while (steps < i) // captures are soon made, and threads are not soon started
            std::this_thread::yield();
        clock->Advance(std::chrono::milliseconds(501)); // whatever has moved is at rest by now
        capturer->SetCaptureMaxSize(i % 7 == 0 ? TVLSize{77, 55} : TVLSize{1920, 1080});
        if (i % 50 == 0)
            capturer->SelectSharedDisplay(i % 100 == 0 ? SIDE : MAIN);
        if (capturer->Capture(frame.Get()) == SHARE_CAPTURE_OK)
            LookAt(*frame.Get(), seen);
    }
    isOver = true;
    other.join();
    std::cout << i << " captures, seed " << SEED << ": " << seen.frames << " frames\n";
    return seen;
}

void ShowsNothingThatIsKeptOut(MakeCapturer make) {
    const auto isAlive = [](const Seen& seen) {
        return seen.frames > TestRounds(20) && seen.kept > TestRounds(10000);
    };
    const Seen seen = CaptureThroughUnrest(make, nullptr, TestRounds(600), isAlive);
    EXPECT_EQ(seen.leaks, 0);
    EXPECT_TRUE(isAlive(seen)) << seen.frames << " frames, " << seen.kept << " pixels";
}

void SeesTheLeakOfAServerThatLies(MakeCapturer make) {
    const SimulatedLie lie = SimulatedLie::UnsharedShown;
    const auto isSeen = [](const Seen& seen) { return seen.leaks > 0; };
    EXPECT_TRUE(isSeen(CaptureThroughUnrest(make, &lie, 200, isSeen)));
}

} // namespace

TEST(DesktopShareHammer, ShowsNothingThatIsKeptOutOfADesktopThatNeverRests) {
    ShowsNothingThatIsKeptOut(OfADesktop);
}

TEST(DesktopShareHammer, SeesTheLeakOfAServerThatGivesOutWhatIsUnshared) {
    SeesTheLeakOfAServerThatLies(OfADesktop);
}

TEST(ApplicationShareHammer, ShowsNothingOfOtherApplications) {
    ShowsNothingThatIsKeptOut(OfAnApplication);
}

TEST(ApplicationShareHammer, SeesTheLeakOfAServerThatGivesOutWhatIsUnshared) {
    SeesTheLeakOfAServerThatLies(OfAnApplication);
}

TEST(WindowShareHammer, ShowsNothingOfOtherWindows) {
    ShowsNothingThatIsKeptOut(OfWindows);
}

TEST(WindowShareHammer, SeesTheLeakOfAServerThatGivesOutWhatIsUnshared) {
    SeesTheLeakOfAServerThatLies(OfWindows);
}
