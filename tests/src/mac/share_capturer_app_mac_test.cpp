// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_capturer_app_mac.h"

#include "tests/src/mac/following_capturer_bench.h"

#include <algorithm>

using namespace platform;
using namespace std::chrono_literals;

namespace {

constexpr unsigned NO_PROCESS = 0x80000000u;

class AppCapturer : public FollowingCapturer<CShareCapturerAppMac> {
protected:
    void Share(unsigned pid) { EXPECT_EQ(capturer.AddSharedProcess(pid), 0); }
    /// Both applications, the editor's window in front, from the first walk on.
    void ShareBoth() {
        Share(PAINTER);
        Share(EDITOR);
        Pass();
    }
    unsigned FrontWindow() { return desktop->GetWindows()->Windows().front().id; }
};

} // namespace

// ---- Its beginning

TEST_F(AppCapturer, IsMadeForApplicationsAfterItWasOneOfADesktop) {
    context->SetShareType(SHARE_TYPE_WINDOW);
    const CTraceLog trace(CM_TRACE_INFO);
    const CShareCapturerAppMac other(context);
    EXPECT_EQ(context->GetShareType(), SHARE_TYPE_APP);
    const Lines types = trace.LinesContaining("SetShareType");
    EXPECT_EQ(types, (Lines{Info("ShareCapturerContext::SetShareType eShareType=1"),
                            Info("ShareCapturerContext::SetShareType eShareType=2")}));
    EXPECT_EQ(trace.LinesContaining("InitCapturer"), Lines{CreationLine(1, true)});
    EXPECT_EQ(trace.Lines().back(), types.back());
}

TEST_F(AppCapturer, KeepsItsOwnProcessOutUnlessThatIsShared) {
    EXPECT_TRUE(context->IsAppUnShared(ShareUtil::GetCurrentPID()));
    Share(ShareUtil::GetCurrentPID());
    EXPECT_FALSE(context->IsAppUnShared(ShareUtil::GetCurrentPID()));
}

TEST_F(AppCapturer, MakesAContextWhenItHasNone) {
    CShareCapturerAppMac alone(nullptr);
    EXPECT_EQ(alone.AddSharedProcess(EDITOR), 0);
    EXPECT_TRUE(alone.IsAppShared(EDITOR));
    EXPECT_EQ(alone.Capture(frame.Get()), 0);
}

TEST_F(AppCapturer, IsWhatTheExportedFunctionMakesForApplications) {
    IShareCapturer* const made = CreateShareCapture(SHARE_CAPTURER_TYPE_APP, context);
    EXPECT_NE(dynamic_cast<CShareCapturerAppMac*>(made), nullptr);
    EXPECT_EQ(DestroyShareCapture(made), 0);
}

// ---- Processes

TEST_F(AppCapturer, SharesAProcessOnItsDisplayAndBringsItForward) {
    desktop->RaiseWindow(EDITOR_WINDOW);
    const CTraceLog trace(CM_TRACE_INFO);
    EXPECT_EQ(capturer.AddSharedProcess(PAINTER), 0);
    EXPECT_TRUE(context->IsAppShared(PAINTER));
    EXPECT_FALSE(context->IsAppShared(EDITOR));
    EXPECT_EQ(SharedMonitors(), Displays{SIDE});
    EXPECT_EQ(capturer.GetCurrentCaptureDisplayId(), SIDE);
    EXPECT_EQ(FrontWindow(), PAINTER_WINDOW);
    EXPECT_EQ(trace.Lines(),
              (Lines{Info("[ShareCapturerTovel::initBmpContext] displayid=2 left = 200 top = 10 width = 100 "
                          "height = 50"),
                     Info("ShareCapturerContext::AddSharedApp processId=5000200,current total count=0"),
                     Info("ShareCapturerContext::AddSharedDisplay displayId=2,current total count=0"),
                     Info("[CShareCapturerAppMac::AddSharedProcess] app is found"),
                     Info("[CShareCapturerAppMac::AddSharedProcess] activateWithOptions return with 1")}));
    EXPECT_EQ(TakeTold(), Lines{});
}

TEST_F(AppCapturer, SharesAProcessThatCanNotBeBroughtForward) {
    desktop->FailNext(SimulatedOperation::BringToFront);
    const CTraceLog trace;
    EXPECT_EQ(capturer.AddSharedProcess(PAINTER), 0);
    EXPECT_TRUE(
        trace.Contains(Info("[CShareCapturerAppMac::AddSharedProcess] activateWithOptions return with 0")));
    EXPECT_EQ(FrontWindow(), EDITOR_WINDOW);
}

TEST_F(AppCapturer, SharesAProcessThatHasEndedFromTheMainDisplay) {
    Share(PAINTER);
    CTraceLog trace;
    desktop->EndApplication(static_cast<pid_t>(PAINTER));
    ASSERT_TRUE(trace.WaitUntilContains("RemoveSharedApp processId=5000200"));
    trace.Clear();
    EXPECT_EQ(capturer.AddSharedProcess(PAINTER), 0);
    EXPECT_TRUE(context->IsAppShared(PAINTER));
    EXPECT_EQ(capturer.GetCurrentCaptureDisplayId(), MAIN);
    EXPECT_EQ(SharedMonitors(), Displays{MAIN});
    EXPECT_EQ(trace.Lines().back(), Info("[CShareCapturerAppMac::AddSharedProcess] app is NULL"));
    EXPECT_FALSE(trace.Contains("activateWithOptions"));
}

TEST_F(AppCapturer, RefusesTheProcessThatIsNoneAndSendsNothing) {
    capturer.SelectSharedMonitor(SIDE);
    const CTraceLog trace;
    EXPECT_EQ(capturer.AddSharedProcess(NO_PROCESS), -2);
    EXPECT_EQ(capturer.RemoveSharedProcess(NO_PROCESS), -2);
    EXPECT_EQ(capturer.GetCurrentCaptureDisplayId(), SIDE);
    EXPECT_EQ(SharedMonitors(), Displays{SIDE});
    EXPECT_EQ(context->GetSharedAppCount(), 0);
    EXPECT_EQ(trace.Lines(), Lines{});
}

TEST_F(AppCapturer, BringsAProcessForwardEachTimeItIsShared) {
    Share(PAINTER);
    Share(EDITOR);
    EXPECT_EQ(FrontWindow(), EDITOR_WINDOW);
    Share(PAINTER);
    EXPECT_EQ(FrontWindow(), PAINTER_WINDOW);
    EXPECT_EQ(context->GetSharedAppCount(), 2);
    EXPECT_EQ(SharedMonitors(), Displays{SIDE});
}

TEST_F(AppCapturer, TakesAProcessOffWhetherOrNotItWasShared) {
    Share(PAINTER);
    const CTraceLog trace;
    EXPECT_EQ(capturer.RemoveSharedProcess(PAINTER), 0);
    EXPECT_FALSE(context->IsAppShared(PAINTER));
    EXPECT_FALSE(trace.Contains("failed to remove")) << "it was";
    EXPECT_EQ(capturer.RemoveSharedProcess(PAINTER), 0);
    ASSERT_EQ(trace.CountContaining("failed to remove"), 1u);
    EXPECT_TRUE(IsLineAt(trace.LinesContaining("failed to remove")[0],
                         Warning("[CShareCapturerAppMac::RemoveSharedProcess] failed to remove shared app"),
                         "src/mac/share_capturer_app_mac"));
    EXPECT_EQ(TakeTold(), Lines{}) << "it had no source";
}

TEST_F(AppCapturer, TakesTheSourceOfAProcessOffWithIt) {
    EXPECT_EQ(capturer.AddCaptureShareSource(Source(SHARE_SOURCE_TYPE_APP, PAINTER).Get()), 0);
    TakeTold();
    EXPECT_EQ(capturer.RemoveSharedProcess(PAINTER), 0);
    EXPECT_EQ(capturer.GetCaptureShareSourceCount(), 0);
    EXPECT_EQ(TakeTold(), Lines{"removed 5000200"});
}

TEST_F(AppCapturer, LetsNobodyChooseItsDisplay) {
    Share(PAINTER);
    for (const unsigned display : {MAIN, SIDE, 7u, SHARE_INVALID_DISPLAY})
        EXPECT_EQ(capturer.SelectSharedDisplay(display), -5);
    EXPECT_EQ(capturer.GetCurrentCaptureDisplayId(), SIDE);
    EXPECT_EQ(SharedMonitors(), Displays{SIDE});
}

// ---- Sources

TEST_F(AppCapturer, TakesApplicationsAsSources) {
    const ShareRef<IShareSource> painter = Source(SHARE_SOURCE_TYPE_APP, PAINTER);
    const CTraceLog trace(CM_TRACE_INFO);
    EXPECT_EQ(capturer.AddCaptureShareSource(painter.Get()), 0);
    EXPECT_EQ(trace.Lines().front(), Info("[CShareCapturerAppMac::AddCaptureShareSource] ssid=5000200"));
    EXPECT_TRUE(context->IsAppShared(PAINTER));
    EXPECT_EQ(capturer.GetCaptureShareSourceCount(), 1);
    EXPECT_EQ(TakeTold(), Lines{"added 5000200"});
    EXPECT_EQ(capturer.AddCaptureShareSource(painter.Get()), -1) << "it is there";
    EXPECT_EQ(trace.CountContaining("app is found"), 2u) << "and has been shared once more before";
}

TEST_F(AppCapturer, RefusesWhatIsNoApplication) {
    const CTraceLog trace(CM_TRACE_INFO);
    EXPECT_EQ(capturer.AddCaptureShareSource(nullptr), -1);
    EXPECT_EQ(capturer.AddCaptureShareSource(Source(SHARE_SOURCE_TYPE_MONITOR, SIDE).Get()), -1);
    EXPECT_EQ(capturer.AddCaptureShareSource(Source(SOURCE_OF_A_WINDOW, PAINTER).Get()), -1);
    EXPECT_EQ(trace.Lines(), Lines{});
    EXPECT_EQ(capturer.AddCaptureShareSource(Source(SHARE_SOURCE_TYPE_APP, NO_PROCESS).Get()), -2);
    EXPECT_EQ(capturer.GetCaptureShareSourceCount(), 0);
    EXPECT_EQ(context->GetSharedAppCount(), 0);
    EXPECT_EQ(TakeTold(), Lines{});
}

TEST_F(AppCapturer, TakesASourceOffWithItsProcess) {
    const ShareRef<IShareSource> painter = Source(SHARE_SOURCE_TYPE_APP, PAINTER);
    EXPECT_EQ(capturer.AddCaptureShareSource(painter.Get()), 0);
    TakeTold();
    const CTraceLog trace(CM_TRACE_INFO);
    EXPECT_EQ(capturer.RemoveCaptureShareSource(painter.Get()), 0);
    EXPECT_EQ(context->GetSharedAppCount(), 0);
    EXPECT_EQ(capturer.GetCaptureShareSourceCount(), 0);
    EXPECT_EQ(TakeTold(), Lines{"removed 5000200"});
    const Lines lines = trace.Lines();
    ASSERT_EQ(lines.size(), 3u);
    EXPECT_EQ(lines[0],
              Info("ShareCapturerContext::RemoveSharedApp processId=5000200,current total count=1"));
    EXPECT_EQ(lines[1], Info("[CShareCapturer::RemoveCaptureShareSource] RemoveSharedApp result=-1"))
        << "asked for twice";
    EXPECT_NE(lines[2].find("[CShareCapturer::NotifyCaptureShareSourceModified]"), std::string::npos);
}

TEST_F(AppCapturer, WarnsOfASourceWhoseProcessIsNotShared) {
    const ShareRef<IShareSource> painter = Source(SHARE_SOURCE_TYPE_APP, PAINTER);
    const CTraceLog trace(CM_TRACE_INFO);
    EXPECT_EQ(capturer.RemoveCaptureShareSource(nullptr), -1);
    EXPECT_EQ(trace.Lines(), Lines{});
    EXPECT_EQ(capturer.RemoveCaptureShareSource(painter.Get()), -1) << "it isn't there";
    EXPECT_TRUE(
        IsLineAt(trace.Lines().front(),
                 Warning("[CShareCapturerAppMac::RemoveCaptureShareSource] failed to remove shared app"),
                 "src/mac/share_capturer_app_mac"));
}

TEST_F(AppCapturer, TakesTheProcessOffThatASourceOfAnotherKindIsNumberedLike) {
    Share(PAINTER);
    const CTraceLog trace;
    EXPECT_EQ(capturer.RemoveCaptureShareSource(Source(SHARE_SOURCE_TYPE_MONITOR, PAINTER).Get()), -1);
    EXPECT_FALSE(trace.Contains("CShareCapturerAppMac"));
    EXPECT_FALSE(context->IsAppShared(PAINTER));
}

// ---- Passes

TEST_F(AppCapturer, ShowsItsApplicationAndNothingElse) {
    Share(EDITOR);
    ASSERT_EQ(Pass(), 0);
    EXPECT_EQ(SizeOf(*frame.Get()), MAIN_SIZE);
    EXPECT_EQ(CountOf(*frame.Get(), GREEN), 60 * 40);
    EXPECT_EQ(CountOf(*frame.Get(), 0x9e9e), 200 * 120 - 60 * 40);
    EXPECT_EQ(PixelAt(*frame.Get(), 20, 30), Rgb(GREEN));
    EXPECT_EQ(frame.Get()->GetMetaInfo().rectCapture, (TVLRect{0, 0, 200, 120}));
}

TEST_F(AppCapturer, TellsAtEachPassThatNothingIsShared) {
    for (int i = 0; i < 2; ++i) {
        EXPECT_EQ(Pass(), -1);
        EXPECT_EQ(TakeTold(), Lines{"no shared app"});
    }
    EXPECT_EQ(SizeOf(*frame.Get()), TVLSize{}) << "nothing was captured";
    Share(EDITOR);
    EXPECT_EQ(Pass(), 0);
    EXPECT_EQ(TakeTold(), Lines{});
    capturer.RemoveSharedProcess(EDITOR);
    EXPECT_EQ(Pass(), -1);
    EXPECT_EQ(TakeTold(), Lines{"no shared app"});
}

TEST_F(AppCapturer, HasNothingToShareOnceItsApplicationHasEnded) {
    Share(EDITOR);
    EXPECT_EQ(Pass(), 0);
    CTraceLog trace;
    desktop->EndApplication(static_cast<pid_t>(EDITOR));
    ASSERT_TRUE(trace.WaitUntilContains("RemoveSharedApp processId=5000100"));
    EXPECT_EQ(Pass(), -1);
    EXPECT_EQ(TakeTold(), Lines{"no shared app"});
}

TEST_F(AppCapturer, MovesToTheFirstDisplayThatItsApplicationsAreOn) {
    // A capturer follows what the walk of the pass before has found.
    ShareBoth();
    Share(PAINTER); // the last one decides until then
    desktop->RaiseWindow(EDITOR_WINDOW);
    EXPECT_EQ(capturer.GetCurrentCaptureDisplayId(), SIDE);
    Displays monitors;
    context->GetAppMonitors(monitors);
    ASSERT_EQ(monitors, (Displays{MAIN, SIDE}));
    unsigned displayWhenTold = 0;
    Displays sharedWhenTold;
    sink.hook = [&] {
        displayWhenTold = capturer.GetCurrentCaptureDisplayId();
        sharedWhenTold = SharedMonitors();
    };
    TakeTold();
    EXPECT_EQ(Pass(), 0);
    EXPECT_EQ(TakeTold(), Lines{ON_MAIN});
    EXPECT_EQ(displayWhenTold, MAIN);
    EXPECT_EQ(sharedWhenTold, Displays{MAIN});
    EXPECT_EQ(SizeOf(*frame.Get()), MAIN_SIZE);
    EXPECT_EQ(frame.Get()->GetMetaInfo().rectCapture, (TVLRect{0, 0, 200, 120}));
    EXPECT_EQ(Pass(), 0);
    EXPECT_EQ(TakeTold(), Lines{}) << "once";
}

TEST_F(AppCapturer, FollowsItsApplicationToTheOtherDisplayAndBack) {
    Share(EDITOR);
    Pass();
    desktop->MoveWindow(EDITOR_WINDOW, {210, 15});
    PassUntilRest();
    EXPECT_EQ(TakeTold(), Lines{ON_SIDE});
    EXPECT_EQ(SizeOf(*frame.Get()), SIDE_SIZE);
    EXPECT_EQ(frame.Get()->GetMetaInfo().rectCapture, (TVLRect{200, 10, 300, 60}));
    EXPECT_EQ(CountOf(*frame.Get(), GREEN), 60 * 40);
    EXPECT_EQ(PixelAt(*frame.Get(), 10, 5), Rgb(GREEN));
    int x = 0;
    int y = 0;
    int width = 0;
    int height = 0;
    EXPECT_EQ(capturer.GetCurrentCaptureSourcePosition(x, y, width, height), 0);
    EXPECT_EQ(std::vector<int>({x, y, width, height}), std::vector<int>({200, 10, 100, 50}));
    TVLSize size{};
    EXPECT_EQ(capturer.GetCurrentCaptureSourceSize(size), 0);
    EXPECT_EQ(size, SIDE_SIZE);

    desktop->MoveWindow(EDITOR_WINDOW, {20, 30});
    PassUntilRest();
    EXPECT_EQ(TakeTold(), Lines{ON_MAIN});
    EXPECT_EQ(SizeOf(*frame.Get()), MAIN_SIZE);
    EXPECT_EQ(CountOf(*frame.Get(), GREEN), 60 * 40);
}

TEST_F(AppCapturer, TakesAnotherOrderOfTheSameDisplaysForAChange) {
    ShareBoth();
    Pass();
    EXPECT_EQ(capturer.GetCurrentCaptureDisplayId(), MAIN);
    TakeTold();
    desktop->RaiseWindow(PAINTER_WINDOW);
    Pass(); // sees it
    Displays monitors;
    context->GetAppMonitors(monitors);
    ASSERT_EQ(monitors, (Displays{SIDE, MAIN}));
    Pass();
    EXPECT_EQ(TakeTold(), Lines{ON_SIDE});
    EXPECT_EQ(capturer.GetCurrentCaptureDisplayId(), SIDE);
}

TEST_F(AppCapturer, StaysWhereItIsWhileItsApplicationsDo) {
    Share(EDITOR);
    Pass();
    Pass();
    capturer.SelectSharedMonitor(SIDE);
    Pass();
    EXPECT_EQ(capturer.GetCurrentCaptureDisplayId(), SIDE) << "the displays of the windows are the same";
    EXPECT_EQ(TakeTold(), Lines{});
}

TEST_F(AppCapturer, TellsNothingWhenAnotherDisplayComesBehindItsOwn) {
    Share(EDITOR);
    Pass();
    Pass();
    Share(PAINTER);
    Share(EDITOR);
    PassUntilRest();
    Displays monitors;
    context->GetAppMonitors(monitors);
    EXPECT_EQ(monitors, (Displays{MAIN, SIDE}));
    EXPECT_EQ(capturer.GetCurrentCaptureDisplayId(), MAIN);
    EXPECT_EQ(TakeTold(), Lines{"cross 1"});
}

TEST_F(AppCapturer, StaysOnItsDisplayWhileItsWindowsAreAway) {
    Share(PAINTER);
    Pass();
    Pass();
    desktop->SetOnScreen(PAINTER_WINDOW, false);
    PassUntilRest();
    Displays monitors;
    context->GetAppMonitors(monitors);
    ASSERT_EQ(monitors, Displays{});
    EXPECT_EQ(Pass(), 0);
    EXPECT_EQ(capturer.GetCurrentCaptureDisplayId(), SIDE);
    EXPECT_EQ(SizeOf(*frame.Get()), SIDE_SIZE);
    EXPECT_EQ(CountOf(*frame.Get(), 0x9e9e), 100 * 50) << "all background";
    desktop->SetOnScreen(PAINTER_WINDOW, true);
    PassUntilRest();
    EXPECT_EQ(CountOf(*frame.Get(), BLUE), 40 * 20);
    EXPECT_EQ(TakeTold(), Lines{});
}

TEST_F(AppCapturer, FailsWhileItsOnlyWindowIsOnNoDisplay) {
    Share(PAINTER);
    Pass();
    desktop->MoveWindow(PAINTER_WINDOW, {1000, 1000});
    PassUntilRest();
    EXPECT_EQ(Pass(), -1) << "there is a window, and no picture of it";
    EXPECT_EQ(capturer.GetCurrentCaptureDisplayId(), SIDE);
    EXPECT_EQ(TakeTold(), Lines{}) << "an application is shared";
}

TEST_F(AppCapturer, TellsOfACrossingOnceItHasStoodForMoreThanASecond) {
    ShareBoth();
    Pass(); // the first one with both displays
    EXPECT_EQ(PassAfter(1000ms), 0);
    EXPECT_EQ(TakeTold(), Lines{});
    EXPECT_EQ(PassAfter(1ms), 0);
    EXPECT_EQ(TakeTold(), Lines{"cross 1"});
    EXPECT_EQ(PassAfter(5s), 0);
    EXPECT_EQ(TakeTold(), Lines{}) << "once";
}

TEST_F(AppCapturer, TellsOfTheEndOfACrossingAlsoWhenNoDisplayIsLeft) {
    ShareBoth();
    PassUntilRest();
    EXPECT_EQ(TakeTold(), Lines{"cross 1"});
    desktop->SetOnScreen(EDITOR_WINDOW, false);
    desktop->SetOnScreen(PAINTER_WINDOW, false);
    PassUntilRest();
    EXPECT_EQ(TakeTold(), Lines{"cross 0"});
    EXPECT_EQ(capturer.GetCurrentCaptureDisplayId(), MAIN);
}

TEST_F(AppCapturer, TellsNothingOfACrossingThatIsShort) {
    Share(EDITOR);
    Pass();
    desktop->SetFrame(EDITOR_WINDOW, {{160, 30}, {60, 20}});
    PassAfter(600ms); // sees it move
    PassAfter(600ms); // takes both displays for a crossing from here on
    Displays monitors;
    context->GetAppMonitors(monitors);
    ASSERT_EQ(monitors, (Displays{MAIN, SIDE}));
    desktop->SetFrame(EDITOR_WINDOW, {{100, 30}, {60, 20}});
    PassAfter(600ms);
    PassAfter(600ms);
    for (int i = 0; i < 4; ++i)
        PassAfter(600ms);
    EXPECT_EQ(TakeTold(), Lines{});
}

TEST_F(AppCapturer, FollowsAlsoWithoutAFrame) {
    ShareBoth();
    Share(PAINTER);
    desktop->RaiseWindow(EDITOR_WINDOW);
    EXPECT_EQ(capturer.Capture(nullptr), -1);
    EXPECT_EQ(TakeTold(), Lines{ON_MAIN});
}

// ---- Without what it needs

TEST_F(AppCapturer, MakesItsBackEndForAProcessButNotForAPass) {
    const CNoBackEndScope noBackEnd;
    settings->m_nScreenCapturerType = CNoBackEndScope::MODE;
    const ShareRef<IShareSource> painter = Source(SHARE_SOURCE_TYPE_APP, PAINTER);
    CShareCapturerAppMac none(context);
    none.AddSink(&sink);
    CTraceLog trace(CM_TRACE_INFO);
    EXPECT_EQ(none.Capture(frame.Get()), -1);
    EXPECT_EQ(none.RemoveSharedProcess(PAINTER), -1);
    EXPECT_EQ(none.RemoveCaptureShareSource(painter.Get()), -1);
    EXPECT_EQ(trace.Lines(), Lines{});
    EXPECT_EQ(none.AddSharedProcess(PAINTER), -1);
    EXPECT_EQ(LinesOfCapturers(trace), Lines{CreationLine(CNoBackEndScope::MODE, false)});
    EXPECT_EQ(none.AddCaptureShareSource(painter.Get()), -1);
    EXPECT_EQ(none.GetCaptureShareSourceCount(), 0);
    EXPECT_EQ(context->GetSharedAppCount(), 0);
    EXPECT_EQ(TakeTold(), Lines{});
    settings->m_nScreenCapturerType = SCREEN_CAPTURER_TYPE_DEFAULT;
    EXPECT_EQ(none.AddSharedProcess(PAINTER), 0);
    EXPECT_EQ(none.Capture(frame.Get()), 0);
    none.RemoveSink(&sink);
}

TEST_F(AppCapturer, WithdrawsAProcessAlsoWhenItHasNoBackEndToTell) {
    context->AddSharedApp(static_cast<unsigned>(PAINTER));
    context->AddSharedApp(static_cast<unsigned>(EDITOR));
    const CNoBackEndScope noBackEnd;
    settings->m_nScreenCapturerType = CNoBackEndScope::MODE;
    CShareCapturerAppMac none(context);
    EXPECT_EQ(none.RemoveSharedProcess(PAINTER), -1);
    EXPECT_FALSE(context->IsAppShared(static_cast<unsigned>(PAINTER)));
    const ShareRef<IShareSource> editor = Source(SHARE_SOURCE_TYPE_APP, EDITOR);
    EXPECT_EQ(none.RemoveCaptureShareSource(editor.Get()), -1);
    EXPECT_EQ(context->GetSharedAppCount(), 0);
}

TEST_F(AppCapturer, SharesNothingWithoutAContext) {
    capturer.LoseContext();
    const CTraceLog trace;
    EXPECT_EQ(capturer.AddSharedProcess(PAINTER), 0);
    EXPECT_EQ(capturer.GetCurrentCaptureDisplayId(), SIDE);
    EXPECT_FALSE(trace.Contains("app is")) << "nobody is brought forward";
    EXPECT_EQ(SharedMonitors(), Displays{});
    EXPECT_EQ(capturer.RemoveSharedProcess(PAINTER), 0);
    EXPECT_EQ(Pass(), 0) << "whatever its back-end shows";
    EXPECT_EQ(TakeTold(), Lines{});
}

TEST_F(AppCapturer, StandsOnWhatTheContextSaysAfterAReinit) {
    Share(PAINTER);
    CShareCapturerAppMac next(context);
    EXPECT_EQ(next.GetCurrentCaptureDisplayId(), MAIN);
    EXPECT_TRUE(next.Reinit());
    EXPECT_EQ(next.GetCurrentCaptureDisplayId(), SIDE);
    EXPECT_TRUE(next.IsAppShared(PAINTER));
    EXPECT_EQ(next.Capture(frame.Get()), 0);
    EXPECT_EQ(CountOf(*frame.Get(), BLUE), 40 * 20);
}
