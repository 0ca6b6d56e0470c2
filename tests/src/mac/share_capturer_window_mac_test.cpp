// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_capturer_window_mac.h"

#include "tests/src/mac/following_capturer_bench.h"

using namespace platform;
using namespace std::chrono_literals;

namespace {

constexpr unsigned NO_WINDOW = 0;

class WindowCapturer : public FollowingCapturer<CShareCapturerWindowMac> {
protected:
    void Share(unsigned window) { EXPECT_EQ(capturer.AddSharedWindow(window), 0); }
    /// Both windows, the editor's in front, from the first walk on.
    void ShareBoth() {
        Share(PAINTER_WINDOW);
        Share(EDITOR_WINDOW);
        Pass();
    }
    Displays FoundMonitors() const {
        Displays displays;
        context->GetAppMonitors(displays);
        return displays;
    }
};

} // namespace

// ---- Its beginning

TEST_F(WindowCapturer, IsMadeForWindowsAfterItWasOneOfADesktop) {
    context->SetShareType(SHARE_TYPE_APP);
    const CTraceLog trace(CM_TRACE_INFO);
    const CShareCapturerWindowMac other(context);
    EXPECT_EQ(context->GetShareType(), SHARE_TYPE_WINDOW);
    const Lines types = trace.LinesContaining("SetShareType");
    EXPECT_EQ(types, (Lines{Info("ShareCapturerContext::SetShareType eShareType=1"),
                            Info("ShareCapturerContext::SetShareType eShareType=3")}));
    EXPECT_EQ(trace.LinesContaining("InitCapturer"), Lines{CreationLine(1, true)});
    EXPECT_EQ(trace.Lines().back(), types.back());
    EXPECT_TRUE(context->IsAppUnShared(ShareUtil::GetCurrentPID()));
}

TEST_F(WindowCapturer, MakesAContextWhenItHasNone) {
    CShareCapturerWindowMac alone(nullptr);
    EXPECT_EQ(alone.AddSharedWindow(EDITOR_WINDOW), 0);
    EXPECT_TRUE(alone.IsWindowShared(EDITOR_WINDOW));
    EXPECT_EQ(alone.Capture(frame.Get()), 0);
}

TEST_F(WindowCapturer, IsWhatTheExportedFunctionMakesForWindows) {
    IShareCapturer* const made = CreateShareCapture(SHARE_CAPTURER_TYPE_WINDOW, context);
    EXPECT_NE(dynamic_cast<CShareCapturerWindowMac*>(made), nullptr);
    EXPECT_EQ(DestroyShareCapture(made), 0);
}

// ---- Windows

TEST_F(WindowCapturer, SharesAWindowOnItsDisplay) {
    const CTraceLog trace(CM_TRACE_INFO);
    EXPECT_EQ(capturer.AddSharedWindow(PAINTER_WINDOW), 0);
    EXPECT_TRUE(context->IsWindowShared(PAINTER_WINDOW));
    EXPECT_FALSE(context->IsWindowShared(EDITOR_WINDOW));
    EXPECT_EQ(capturer.GetCurrentCaptureDisplayId(), SIDE);
    EXPECT_EQ(SharedMonitors(), Displays{SIDE});
    EXPECT_EQ(
        trace.Lines(),
        (Lines{
            Info(
                "[ShareCapturerTovel::initBmpContext] displayid=2 left = 200 top = 10 width = 100 height = 50"),
            Info("ShareCapturerContext::AddSharedDisplay displayId=2,current total count=0"),
            Info("ShareCapturerContext::AddSharedWindow windowHandle=2,current total count=0")}));
}

TEST_F(WindowCapturer, LooksForTheDisplayOfAWindowThatItThenRefuses) {
    capturer.SelectSharedMonitor(SIDE);
    EXPECT_EQ(capturer.AddSharedWindow(NO_WINDOW), -2);
    EXPECT_EQ(context->GetSharedWindowCount(), 0);
    EXPECT_EQ(SharedMonitors(), Displays{MAIN}) << "where a window is that isn't there";
}

TEST_F(WindowCapturer, CapturesTheDisplayOfTheLastWindowUntilAWalkHasDecided) {
    Share(EDITOR_WINDOW);
    Share(PAINTER_WINDOW);
    EXPECT_EQ(capturer.GetCurrentCaptureDisplayId(), SIDE);
    Pass();
    EXPECT_EQ(capturer.GetCurrentCaptureDisplayId(), SIDE) << "no walk had been before that one";
    ASSERT_EQ(FoundMonitors(), (Displays{MAIN, SIDE})) << "the editor's window is in front";
    EXPECT_EQ(TakeTold(), Lines{});
    EXPECT_EQ(Pass(), SHARE_CAPTURE_DRAGGING) << "other parts of the windows are seen now";
    EXPECT_EQ(capturer.GetCurrentCaptureDisplayId(), MAIN);
    EXPECT_EQ(TakeTold(), Lines{ON_MAIN});
    EXPECT_EQ(SharedMonitors(), Displays{MAIN});
    EXPECT_EQ(PassAfter(600ms), 0);
    EXPECT_EQ(SizeOf(*frame.Get()), MAIN_SIZE);
    EXPECT_EQ(CountOf(*frame.Get(), GREEN), 60 * 40);
}

TEST_F(WindowCapturer, LetsItsDisplayBeSelected) {
    Share(PAINTER_WINDOW);
    EXPECT_EQ(capturer.SelectSharedDisplay(MAIN), 0);
    EXPECT_EQ(capturer.GetCurrentCaptureDisplayId(), MAIN);
    EXPECT_EQ(capturer.SelectSharedDisplay(SHARE_INVALID_DISPLAY), -2);
    EXPECT_EQ(SharedMonitors(), Displays{MAIN});
}

TEST_F(WindowCapturer, HasNoProcesses) {
    EXPECT_EQ(capturer.AddSharedProcess(EDITOR), -3);
    EXPECT_EQ(capturer.RemoveSharedProcess(EDITOR), -3);
}

// ---- Sources

TEST_F(WindowCapturer, TakesAWindowFromASourceWithoutKeepingTheSource) {
    const ShareRef<IShareSource> painter = Source(SOURCE_OF_A_WINDOW, (1ul << 32) + PAINTER_WINDOW);
    const CTraceLog trace(CM_TRACE_INFO);
    EXPECT_EQ(capturer.AddCaptureShareSource(painter.Get()), 0);
    EXPECT_EQ(trace.Lines().front(),
              Info("[CShareCapturerWindowMac::AddCaptureShareSource] ssid=4294967298"));
    EXPECT_TRUE(context->IsWindowShared(PAINTER_WINDOW)) << "ids are cut to 32 bits";
    EXPECT_EQ(capturer.GetCurrentCaptureDisplayId(), SIDE);
    EXPECT_EQ(SharedMonitors(), Displays{SIDE});
    EXPECT_EQ(capturer.GetCaptureShareSourceCount(), 0);
    EXPECT_EQ(capturer.GetCaptureShareSource(0), nullptr);
    EXPECT_EQ(capturer.AddCaptureShareSource(painter.Get()), 0) << "as often as one likes";
    EXPECT_EQ(context->GetSharedWindowCount(), 1);
    EXPECT_EQ(TakeTold(), Lines{});
}

TEST_F(WindowCapturer, TakesAWindowOffByItsSource) {
    const ShareRef<IShareSource> painter = Source(SOURCE_OF_A_WINDOW, PAINTER_WINDOW);
    capturer.AddCaptureShareSource(painter.Get());
    const CTraceLog trace(CM_TRACE_INFO);
    EXPECT_EQ(capturer.RemoveCaptureShareSource(painter.Get()), 0);
    EXPECT_EQ(trace.Lines().front(), Info("[CShareCapturerWindowMac::RemoveCaptureShareSource] window=2"));
    EXPECT_FALSE(context->IsWindowShared(PAINTER_WINDOW));
    EXPECT_EQ(capturer.RemoveCaptureShareSource(painter.Get()), -1) << "it isn't there";
    EXPECT_EQ(TakeTold(), Lines{});
}

TEST_F(WindowCapturer, RefusesWhatIsNoWindow) {
    Share(PAINTER_WINDOW);
    const CTraceLog trace(CM_TRACE_INFO);
    for (const ShareSourceType type : {SHARE_SOURCE_TYPE_APP, SHARE_SOURCE_TYPE_MONITOR}) {
        const ShareRef<IShareSource> other = Source(type, PAINTER_WINDOW);
        EXPECT_EQ(capturer.AddCaptureShareSource(other.Get()), -1);
        EXPECT_EQ(capturer.RemoveCaptureShareSource(other.Get()), -1);
    }
    EXPECT_EQ(capturer.AddCaptureShareSource(nullptr), -1);
    EXPECT_EQ(capturer.RemoveCaptureShareSource(nullptr), -1);
    EXPECT_EQ(trace.Lines(), Lines{});
    EXPECT_TRUE(context->IsWindowShared(PAINTER_WINDOW));
}

TEST_F(WindowCapturer, GivesTheRefusalOfAWindowThatIsNone) {
    const ShareRef<IShareSource> none = Source(SOURCE_OF_A_WINDOW, NO_WINDOW);
    EXPECT_EQ(capturer.AddCaptureShareSource(none.Get()), -2);
    EXPECT_EQ(capturer.RemoveCaptureShareSource(none.Get()), -2);
}

// ---- Passes

TEST_F(WindowCapturer, ShowsItsWindowAlsoWhereAnotherOneCoversIt) {
    desktop->SetFrame(PAINTER_WINDOW, {{0, 0}, {200, 120}});
    desktop->RaiseWindow(PAINTER_WINDOW);
    Share(EDITOR_WINDOW);
    ASSERT_EQ(Pass(), 0);
    EXPECT_EQ(SizeOf(*frame.Get()), MAIN_SIZE);
    EXPECT_EQ(CountOf(*frame.Get(), GREEN), 60 * 40);
    EXPECT_EQ(CountOf(*frame.Get(), 0x9e9e), 200 * 120 - 60 * 40);
    EXPECT_EQ(frame.Get()->GetMetaInfo().rectCapture, (TVLRect{0, 0, 200, 120}));
}

TEST_F(WindowCapturer, GivesTheAnswerOfItsBackEndWhenNoWindowIsLeft) {
    EXPECT_EQ(Pass(), 0) << "nothing was shared yet";
    Share(EDITOR_WINDOW);
    PassUntilRest();
    EXPECT_EQ(CountOf(*frame.Get(), GREEN), 60 * 40);
    EXPECT_EQ(capturer.RemoveSharedWindow(EDITOR_WINDOW), 0);
    PassUntilRest();
    EXPECT_EQ(Pass(), 0);
    EXPECT_EQ(CountOf(*frame.Get(), 0x9e9e), 200 * 120) << "all background";
    EXPECT_EQ(TakeTold(), Lines{});
}

TEST_F(WindowCapturer, FollowsItsWindowToTheOtherDisplayAndBack) {
    Share(EDITOR_WINDOW);
    Pass();
    desktop->MoveWindow(EDITOR_WINDOW, {210, 15});
    PassUntilRest();
    EXPECT_EQ(TakeTold(), Lines{ON_SIDE});
    EXPECT_EQ(SizeOf(*frame.Get()), SIDE_SIZE);
    EXPECT_EQ(frame.Get()->GetMetaInfo().rectCapture, (TVLRect{200, 10, 300, 60}));
    EXPECT_EQ(CountOf(*frame.Get(), GREEN), 60 * 40);
    EXPECT_EQ(PixelAt(*frame.Get(), 10, 5), Rgb(GREEN));

    desktop->MoveWindow(EDITOR_WINDOW, {20, 30});
    PassUntilRest();
    EXPECT_EQ(TakeTold(), Lines{ON_MAIN});
    EXPECT_EQ(SizeOf(*frame.Get()), MAIN_SIZE);
    EXPECT_EQ(CountOf(*frame.Get(), GREEN), 60 * 40);
}

TEST_F(WindowCapturer, MovesWhenTheOtherDisplayComesFirst) {
    ShareBoth();
    Pass();
    TakeTold();
    desktop->RaiseWindow(PAINTER_WINDOW);
    Pass();
    ASSERT_EQ(FoundMonitors(), (Displays{SIDE, MAIN}));
    Pass();
    EXPECT_EQ(TakeTold(), Lines{ON_SIDE});
    EXPECT_EQ(capturer.GetCurrentCaptureDisplayId(), SIDE);
}

TEST_F(WindowCapturer, StaysOnItsDisplayWhileItsWindowIsAway) {
    Share(PAINTER_WINDOW);
    Pass();
    desktop->SetOnScreen(PAINTER_WINDOW, false);
    PassUntilRest();
    ASSERT_EQ(FoundMonitors(), Displays{});
    EXPECT_EQ(capturer.GetCurrentCaptureDisplayId(), SIDE);
    desktop->SetOnScreen(PAINTER_WINDOW, true);
    PassUntilRest();
    EXPECT_EQ(CountOf(*frame.Get(), BLUE), 40 * 20);
    EXPECT_EQ(TakeTold(), Lines{});
}

TEST_F(WindowCapturer, TellsOfACrossingOnceItHasStoodForMoreThanASecond) {
    ShareBoth();
    Pass();
    EXPECT_EQ(PassAfter(1000ms), 0);
    EXPECT_EQ(TakeTold(), Lines{});
    EXPECT_EQ(PassAfter(1ms), 0);
    EXPECT_EQ(TakeTold(), Lines{"cross 1"});
    capturer.RemoveSharedWindow(PAINTER_WINDOW);
    PassUntilRest();
    EXPECT_EQ(TakeTold(), Lines{"cross 0"});
}

// ---- Without what it needs

TEST_F(WindowCapturer, MakesItsBackEndForASourceButNotForAPass) {
    const CNoBackEndScope noBackEnd;
    settings->m_nScreenCapturerType = CNoBackEndScope::MODE;
    const ShareRef<IShareSource> painter = Source(SOURCE_OF_A_WINDOW, PAINTER_WINDOW);
    CShareCapturerWindowMac none(context);
    CTraceLog trace(CM_TRACE_INFO);
    EXPECT_EQ(none.Capture(frame.Get()), -1);
    EXPECT_EQ(trace.Lines(), Lines{});
    EXPECT_EQ(none.AddCaptureShareSource(painter.Get()), -1);
    Lines expected{Info("[CShareCapturerWindowMac::AddCaptureShareSource] ssid=2")};
    expected.push_back(CreationLine(CNoBackEndScope::MODE, false));
    EXPECT_EQ(LinesOfCapturers(trace), expected);
    EXPECT_EQ(context->GetSharedWindowCount(), 0);
    EXPECT_EQ(none.AddSharedWindow(PAINTER_WINDOW), 0) << "which doesn't ask for one";
    EXPECT_EQ(SharedMonitors(), Displays{SIDE});
    EXPECT_EQ(none.Capture(frame.Get()), -1);
    settings->m_nScreenCapturerType = SCREEN_CAPTURER_TYPE_DEFAULT;
    EXPECT_EQ(none.AddCaptureShareSource(painter.Get()), 0);
    EXPECT_EQ(none.GetCurrentCaptureDisplayId(), SIDE);
    EXPECT_EQ(none.Capture(frame.Get()), 0);
}

TEST_F(WindowCapturer, MovesToTheDisplayOfAWindowEvenWithoutAContext) {
    capturer.LoseContext();
    EXPECT_EQ(capturer.AddSharedWindow(PAINTER_WINDOW), -4);
    EXPECT_EQ(capturer.GetCurrentCaptureDisplayId(), SIDE);
    EXPECT_EQ(SharedMonitors(), Displays{});
    EXPECT_EQ(capturer.RemoveCaptureShareSource(Source(SOURCE_OF_A_WINDOW, PAINTER_WINDOW).Get()), -4);
    EXPECT_EQ(Pass(), 0) << "whatever its back-end shows";
    EXPECT_EQ(TakeTold(), Lines{});
}

TEST_F(WindowCapturer, StandsOnWhatTheContextSaysAfterAReinit) {
    Share(PAINTER_WINDOW);
    CShareCapturerWindowMac next(context);
    EXPECT_EQ(next.GetCurrentCaptureDisplayId(), MAIN);
    EXPECT_TRUE(next.Reinit());
    EXPECT_EQ(next.GetCurrentCaptureDisplayId(), SIDE);
    EXPECT_EQ(next.Capture(frame.Get()), 0);
    EXPECT_EQ(CountOf(*frame.Get(), BLUE), 40 * 20);
}
