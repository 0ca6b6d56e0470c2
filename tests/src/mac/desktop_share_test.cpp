// SPDX-License-Identifier: Apache-2.0
#include "platform/core_graphics.h"
#include "tests/src/mac/backend_tools.h"
#include "tests/support/engine_bench.h"

#include <screenshare/share_engine.h>

#include <gtest/gtest.h>

#include <mutex>
#include <string>
#include <vector>

// Shares of a monitor from the client's first call to the pixels in its sink, on a simulated desktop and a
// clock that stands still. What must not be seen is pure red, and nothing else has any red.

using namespace platform;

namespace {

constexpr unsigned SIDE = 2;
constexpr pid_t DESKTOP = 5'000'001;
constexpr pid_t EDITOR = 5'000'100;
constexpr pid_t SECRETS = 5'000'200;
constexpr std::uint32_t RED = 0xFF0000;
constexpr std::uint32_t GREEN = 0x00FF00;
constexpr std::uint32_t BLUE = 0x0000FF;
constexpr std::uint32_t TEAL = 0x008080;

constexpr CGWindowID WALLPAPER = 2;
constexpr CGWindowID EDITOR_WINDOW = 3;
constexpr CGWindowID SECRET_WINDOW = 4;
constexpr CGWindowID SECRET_OF_EDITOR = 5;

/// On the side display: a wallpaper, a text, a secret in front of a part of it, and another one of the
/// editor's own.
Scene SecretDesk(PixelFormat wallpaper = PixelFormat::BGRX) {
    return Scene()
        .Display(0, 0, 200, 120)
        .Display(200, 0, 100, 60)
        .App(DESKTOP, "Desktop")
        .Window(1)
        .At(0, 0, 200, 120)
        .Colour(TEAL)
        .Level(SIMULATED_LEVEL_DESKTOP)
        .Window(WALLPAPER)
        .At(200, 0, 100, 60)
        .Colour(BLUE)
        .Format(wallpaper)
        .Level(SIMULATED_LEVEL_DESKTOP)
        .App(EDITOR, "Editor")
        .Window(EDITOR_WINDOW)
        .At(210, 10, 40, 20)
        .Colour(GREEN)
        .Pointer(1000, 1000)
        .App(SECRETS, "Secrets")
        .Window(SECRET_WINDOW)
        .At(230, 20, 30, 20)
        .Colour(RED)
        .App(EDITOR, "Editor")
        .Window(SECRET_OF_EDITOR)
        .At(280, 40, 10, 10)
        .Colour(RED);
}

/// An engine that shares a monitor, with all frames of its client.
class DesktopShare : public testing::Test {
protected:
    DesktopShare() {
        EXPECT_EQ(CGDisplayRegisterReconfigurationCallback(Hear, this), 0);
        sink.SetFrameHook([this](IShareFrame* frame) {
            const std::lock_guard<std::mutex> lock(m_mutex);
            m_last = NewFrame();
            m_last.Get()->CopyIShareFrame(frame);
            m_meta = frame->GetMetaInfo();
        });
    }
    ~DesktopShare() override {
        EXPECT_EQ(DestroyShareCaptureEngine(engine), 0);
        EXPECT_EQ(CGDisplayRemoveReconfigurationCallback(Hear, this), 0);
    }

    void ShareMonitor(unsigned long display) {
        IShareSourceEnumerator* const monitors =
            CreateShareSourceEnumerator(SHARE_SOURCE_ENUMERATOR_TYPE_MONITOR, false);
        monitors->Refresh();
        IShareSource* source = nullptr;
        ASSERT_EQ(monitors->GetSourceBySourceId(display, &source), 0);
        EXPECT_EQ(engine->AddCaptureShareSource(source), 0);
        source->Release();
        DestroyShareSourceEnumerator(monitors);
    }
    void KeepSecrets() {
        EXPECT_EQ(engine->AddUnSharedProcess(static_cast<unsigned>(SECRETS)), 0);
        EXPECT_EQ(engine->AddUnSharedWindow(SECRET_OF_EDITOR), 0);
    }
    void Start() {
        EXPECT_EQ(engine->SetSink(&sink), 0);
        ASSERT_EQ(engine->Start(), 0);
    }
    void Tick(int count = 1) {
        for (int i = 0; i < count; ++i) {
            clock->Advance(std::chrono::milliseconds(200));
            Settle(*engine->_GetWorker());
        }
    }
    /// Long enough for windows that moved to be at rest.
    void TickUntilRest() { Tick(5); }
    /// Comes back when the engine has heard of that many changes of displays.
    [[nodiscard]] bool Heard(unsigned flag) {
        CTally& tally = flag == kCGDisplayAddFlag      ? m_added
                        : flag == kCGDisplayRemoveFlag ? m_removed
                                                       : m_reshaped;
        return tally.Reaches(1);
    }
    IShareFrame& Last() {
        const std::lock_guard<std::mutex> lock(m_mutex);
        return *m_last.Get();
    }
    TVLRect LastRect() {
        const std::lock_guard<std::mutex> lock(m_mutex);
        return m_meta.rectCapture;
    }

    CManualClockScope clock;
    CSettingsScope settings;
    CServedScene desktop{SecretDesk()};
    CCallLog calls;
    CRecordingSink sink{calls};
    CEngineProbe<CShareCaptureDesktopEngine>* const engine = new CEngineProbe<CShareCaptureDesktopEngine>;

private:
    /// Registered after the engine's own, so it runs after that.
    static void Hear(CGDirectDisplayID, unsigned flags, void* test) {
        auto& self = *static_cast<DesktopShare*>(test);
        if ((flags & kCGDisplayAddFlag) != 0)
            self.m_added.Add();
        if ((flags & kCGDisplayRemoveFlag) != 0)
            self.m_removed.Add();
        if ((flags & kCGDisplayDesktopShapeChangedFlag) != 0)
            self.m_reshaped.Add();
    }

    std::mutex m_mutex;
    FrameRef m_last = NewFrame();   // guarded by m_mutex
    IShareFrame::MetaInfo m_meta{}; // guarded by m_mutex
    CTally m_added;
    CTally m_removed;
    CTally m_reshaped;
};

} // namespace

TEST_F(DesktopShare, ShowsTheSecondMonitorWhole) {
    ShareMonitor(SIDE);
    Start();
    Tick();
    ASSERT_EQ(sink.FrameCount(), 1u);
    EXPECT_EQ(SizeOf(Last()), (TVLSize{100, 60}));
    EXPECT_EQ(LastRect(), (TVLRect{200, 0, 300, 60}));
    EXPECT_EQ(CountOf(Last(), RED), 30 * 20 + 10 * 10);
    EXPECT_EQ(CountOf(Last(), GREEN), 40 * 20 - 20 * 10);
    EXPECT_EQ(CountOf(Last(), BLUE), 100 * 60 - 40 * 20 - 30 * 20 - 10 * 10 + 20 * 10);
    EXPECT_EQ(PixelAt(Last(), 10, 10), Rgb(GREEN));
    EXPECT_EQ(PixelAt(Last(), 9, 10), Rgb(BLUE));
    EXPECT_EQ(engine->Stop(), 0);
}

TEST_F(DesktopShare, StartsOnTheMainMonitorWhenNoneWasChosen) {
    Start();
    Tick();
    ASSERT_EQ(sink.FrameCount(), 1u);
    EXPECT_EQ(SizeOf(Last()), (TVLSize{200, 120}));
    EXPECT_EQ(CountOf(Last(), TEAL), 200 * 120);
}

TEST_F(DesktopShare, KeepsAnApplicationAndAWindowOut) {
    ShareMonitor(SIDE);
    KeepSecrets();
    Start();
    Tick();
    ASSERT_EQ(sink.FrameCount(), 1u);
    EXPECT_EQ(CountOf(Last(), RED), 0);
    EXPECT_EQ(CountOf(Last(), GREEN), 40 * 20) << "whole, also under the secret";
    EXPECT_EQ(CountOf(Last(), BLUE), 100 * 60 - 40 * 20);
}

TEST_F(DesktopShare, ShowsNothingThatIsKeptOutWhicheverCallToTheWindowServerFails) {
    ShareMonitor(SIDE);
    KeepSecrets();
    Start();
    Tick();
    int shown = 0;
    for (const SimulatedOperation operation :
         {SimulatedOperation::GetLife, SimulatedOperation::GetWindows, SimulatedOperation::GetDisplays,
          SimulatedOperation::GetCapability, SimulatedOperation::GetApplications,
          SimulatedOperation::GetPointerPosition, SimulatedOperation::TakeWindowPicture}) {
        for (unsigned nth = 1; nth <= 60; ++nth) {
            const std::size_t before = sink.FrameCount();
            desktop->FailNth(operation, nth, PictureOutcome::Failed);
            Tick();
            desktop->Heal(operation);
            ASSERT_EQ(CountOf(Last(), RED), 0) << static_cast<int>(operation) << " call " << nth;
            shown += sink.FrameCount() > before ? 1 : 0;
            TickUntilRest();
        }
    }
    EXPECT_GT(shown, 100);
}

TEST_F(DesktopShare, LeavesNothingInItsFramesOfWhatIsKeptOutFromNowOn) {
    for (const PixelFormat wallpaper : {PixelFormat::BGRX, PixelFormat::BGRA}) {
        SCOPED_TRACE(wallpaper == PixelFormat::BGRX ? "opaque" : "with alpha");
        desktop->Show(SecretDesk(wallpaper).Build());
        if (engine->GetCaptureShareSourceCount() == 0) {
            ShareMonitor(SIDE);
            Start();
        }
        engine->RemoveUnSharedProcess(static_cast<unsigned>(SECRETS));
        engine->RemoveUnSharedWindow(SECRET_OF_EDITOR);
        TickUntilRest();
        Tick(2); // both frames of the engine have shown it
        EXPECT_EQ(CountOf(Last(), RED), 30 * 20 + 10 * 10);
        KeepSecrets();
        Settle(*engine->_GetWorker()); // one change and not two, with a pause of its own after each
        TickUntilRest();
        const std::size_t before = sink.FrameCount();
        for (int i = 0; i < 4; ++i) {
            Tick();
            EXPECT_EQ(CountOf(Last(), RED), 0);
        }
        EXPECT_EQ(sink.FrameCount(), before + 4);
        EXPECT_EQ(CountOf(Last(), GREEN), 40 * 20);
    }
}

TEST_F(DesktopShare, LeavesNothingOfASecretWhereNothingIsBehindIt) {
    desktop->CloseWindow(WALLPAPER);
    ShareMonitor(SIDE);
    Start();
    Tick(2);
    EXPECT_EQ(CountOf(Last(), RED), 30 * 20 + 10 * 10);
    KeepSecrets();
    Settle(*engine->_GetWorker());
    TickUntilRest();
    Tick(2);
    EXPECT_EQ(CountOf(Last(), RED), 0);
    EXPECT_EQ(CountOf(Last(), 0), 100 * 60 - 40 * 20);
}

TEST_F(DesktopShare, HoldsThePictureBackDuringADragAndThenGoesOn) {
    ShareMonitor(SIDE);
    KeepSecrets();
    Start();
    Tick();
    sink.Clear();
    desktop->MoveWindow(SECRET_WINDOW, {215, 15}); // what is seen of the share changes with it
    Tick();
    EXPECT_TRUE(sink.WaitForNotice("event 1001 -303"));
    EXPECT_EQ(sink.FrameCount(), 0u);
    Tick(2);
    EXPECT_EQ(sink.FrameCount(), 0u) << "600 ms are not over";
    EXPECT_TRUE(sink.WaitForNotice("event 1001 -303", 3));
    Tick();
    EXPECT_EQ(sink.FrameCount(), 1u);
    EXPECT_EQ(CountOf(Last(), RED), 0);
    EXPECT_EQ(CountOf(Last(), GREEN), 40 * 20);
}

TEST_F(DesktopShare, ComesBackWithTheMonitorThatWasUnplugged) {
    ShareMonitor(SIDE);
    KeepSecrets();
    Start();
    Tick();
    desktop->RemoveDisplay(SIDE);
    EXPECT_TRUE(Heard(kCGDisplayRemoveFlag));
    EXPECT_TRUE(sink.WaitForNotice("error -203"));
    TickUntilRest();
    const std::size_t before = sink.FrameCount();
    Tick(3);
    EXPECT_EQ(sink.FrameCount(), before) << "there is nothing to show";

    SimulatedDisplay again;
    again.id = SIDE;
    again.bounds = {{200, 0}, {100, 60}};
    desktop->AddDisplay(again);
    EXPECT_TRUE(Heard(kCGDisplayAddFlag));
    TickUntilRest();
    EXPECT_GT(sink.FrameCount(), before);
    EXPECT_EQ(SizeOf(Last()), (TVLSize{100, 60}));
    EXPECT_EQ(CountOf(Last(), RED), 0);
    EXPECT_EQ(CountOf(Last(), GREEN), 40 * 20);
    EXPECT_EQ(sink.CountNotices("error -203"), 1u);
}

TEST_F(DesktopShare, FollowsTheResolutionOfItsMonitor) {
    ShareMonitor(SIDE);
    KeepSecrets();
    Start();
    Tick();
    desktop->ResizeDisplay(SIDE, {80, 40});
    EXPECT_TRUE(Heard(kCGDisplayDesktopShapeChangedFlag));
    EXPECT_TRUE(sink.WaitForNotice("size 80x40"));
    EXPECT_TRUE(sink.WaitForNotice("position 200,0 80x40"));
    TickUntilRest();
    EXPECT_EQ(SizeOf(Last()), (TVLSize{80, 40}));
    EXPECT_EQ(LastRect(), (TVLRect{200, 0, 280, 40}));
    EXPECT_EQ(CountOf(Last(), RED), 0);
    EXPECT_EQ(CountOf(Last(), GREEN), 40 * 20);
}

TEST_F(DesktopShare, FallsBackToTheDefaultFromAModeThatGivesNoPicture) {
    ShareMonitor(SIDE);
    KeepSecrets();
    Start();
    Tick();
    EXPECT_EQ(engine->SetCaptureMode(SCREEN_CAPTURER_TYPE_CGS_GCD), 0);
    Tick();
    const std::size_t before = sink.FrameCount();
    Tick(25); // five seconds
    EXPECT_EQ(sink.FrameCount(), before);
    Tick(5);
    EXPECT_GT(sink.FrameCount(), before);
    EXPECT_EQ(settings->GetScreenCapturerType(), 1);
    EXPECT_EQ(LastRect(), (TVLRect{200, 0, 300, 60})) << "of the same monitor";
    EXPECT_EQ(CountOf(Last(), RED), 0) << "with the same kept out";
}

TEST_F(DesktopShare, OutlivesAWindowServerThatIsLostAndFound) {
    ShareMonitor(SIDE);
    KeepSecrets();
    Start();
    Tick(2);
    desktop->Lose();
    TickUntilRest();
    Tick(3);
    desktop->FindAgain();
    EXPECT_TRUE(Heard(kCGDisplayAddFlag));
    TickUntilRest();
    EXPECT_EQ(SizeOf(Last()), (TVLSize{100, 60}));
    EXPECT_EQ(CountOf(Last(), RED), 0);
    EXPECT_EQ(CountOf(Last(), GREEN), 40 * 20);
}
