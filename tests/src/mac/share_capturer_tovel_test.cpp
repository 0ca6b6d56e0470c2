// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_capturer_tovel.h"

#include "platform/app_kit.h"
#include "src/mac/share_capturer_context_mac.h"
#include "src/share_util.h"
#include "tests/src/mac/backend_tools.h"
#include "tests/support/engine_bench.h"

#include <screenshare/share_capturer.h>

#include <gtest/gtest.h>

#include <chrono>
#include <string>
#include <vector>

using namespace platform;

namespace {

using Lines = std::vector<std::string>;

constexpr unsigned MAIN = 1;
constexpr unsigned SIDE = 2;
constexpr pid_t EDITOR = 5'000'100;
constexpr std::uint32_t GREEN = 0x00FF00;

CGRect Rect(float x, float y, float width, float height) {
    return {{x, y}, {width, height}};
}

Scene Desk() {
    return Scene()
        .Display(0, 0, 200, 120)
        .Display(200, 10, 100, 50)
        .Scale(2)
        .App(EDITOR, "Editor")
        .Window(1)
        .At(50, 40, 80, 40)
        .Colour(GREEN)
        .Pointer(1000, 1000);
}

class DefaultBackEnd : public testing::Test {
protected:
    DefaultBackEnd() { EXPECT_TRUE(backEnd.init(context)); }

    unsigned Capture() { return backEnd.captureToIShareFrame(frame.Get()); }
    void ShareApp() {
        context->AddSharedDisplay(MAIN);
        context->AddSharedApp(static_cast<unsigned>(EDITOR));
        context->SetShareType(SHARE_TYPE_APP);
    }
    static unsigned Code(int result) { return static_cast<unsigned>(result); }

    CManualClockScope clock;
    CSettingsScope settings;
    CServedScene desktop{Desk()};
    std::shared_ptr<ShareCapturerContext> context = std::make_shared<ShareCapturerContextMac>();
    ShareCapturerTovel backEnd;
    FrameRef frame = NewFrameRef();
};

} // namespace

TEST_F(DefaultBackEnd, IsReadyOnTheMainDisplayAfterInit) {
    EXPECT_EQ(backEnd.getCaptureDisplay(), MAIN);
    EXPECT_EQ(backEnd.getCaptureRect(), Rect(0, 0, 200, 120));
    EXPECT_EQ(backEnd.getFrameSize(), (TVLSize{200, 120}));
    EXPECT_TRUE(context->IsAppUnShared(ShareUtil::GetCurrentPID())) << "our own windows are kept out";
}

TEST_F(DefaultBackEnd, TracesItsBeginningAndItsEnd) {
    const CTraceLog trace;
    {
        ShareCapturerTovel other;
        EXPECT_TRUE(other.init());
    }
    EXPECT_EQ(trace.LinesContaining("[ShareCapturerTovel"),
              (Lines{Info("[ShareCapturerTovel::init] without context"),
                     Info("[ShareCapturerTovel::initBmpContext] displayid=1 left = 0 top = 0 width = 200 "
                          "height = 120"),
                     Debug("[ShareCapturerTovel::dealloc]")}));
}

TEST_F(DefaultBackEnd, AnswersWhatEveryBackEndAnswers) {
    EXPECT_EQ(backEnd.capture(), nullptr);
    EXPECT_EQ(backEnd.getCaptureFormat(), 1);
    EXPECT_EQ(backEnd.setCaptureThreadCount(3), Code(-5));
    EXPECT_EQ(backEnd.setFPS(30), 0);
    EXPECT_EQ(backEnd.getSharedAppCount(), 0u);
    EXPECT_FALSE(backEnd.IsWindowAreaBaseContentSupport());
    ShareApp();
    EXPECT_EQ(backEnd.getSharedAppCount(), 1u);
    EXPECT_TRUE(backEnd.IsWindowAreaBaseContentSupport());
    ShareCapturerTovel unfit;
    EXPECT_EQ(unfit.captureToIShareFrame(frame.Get()), Code(-1));
    EXPECT_EQ(unfit.pointerCaptured(), 0);
    EXPECT_EQ(unfit.getSharedAppCount(), 0u);
    EXPECT_FALSE(unfit.IsWindowAreaBaseContentSupport());
}

TEST_F(DefaultBackEnd, CapturesWithStampAndMetaInformation) {
    clock->Advance(std::chrono::milliseconds(1234));
    EXPECT_EQ(Capture(), 0u);
    EXPECT_EQ(CountOf(*frame.Get(), GREEN), 80 * 40);
    EXPECT_EQ(frame.Get()->GetTimestamp(), ShareUtil::GetCaptureFrameTimeStamp());
    EXPECT_EQ(frame.Get()->GetMetaInfo().rectCapture, (TVLRect{0, 0, 200, 120}));
    EXPECT_EQ(backEnd.pointerCaptured(), 1) << "it is elsewhere";
    desktop->SetPointer(CGPoint{10, 10});
    EXPECT_EQ(Capture(), 0u);
    EXPECT_EQ(backEnd.pointerCaptured(), 0) << "there is no cursor";
}

TEST_F(DefaultBackEnd, StampsAFrameOnceItsPictureIsThere) {
    desktop->DoAt(SimulatedOperation::TakeWindowPicture, 1,
                  [this] { clock->Advance(std::chrono::milliseconds(50)); });
    const unsigned begun = ShareUtil::GetCaptureFrameTimeStamp();
    EXPECT_EQ(Capture(), 0u);
    EXPECT_EQ(frame.Get()->GetTimestamp(), begun + 50);
}

TEST_F(DefaultBackEnd, StampsTheFrameOfAFailureToo) {
    clock->Advance(std::chrono::milliseconds(77));
    desktop->FailNext(SimulatedOperation::TakeWindowPicture);
    EXPECT_EQ(Capture(), Code(-1));
    EXPECT_EQ(frame.Get()->GetTimestamp(), ShareUtil::GetCaptureFrameTimeStamp());
    EXPECT_EQ(Capture(), 0u);
}

TEST_F(DefaultBackEnd, RefusesNoFrameBeforeItLooksAtTheDesktop) {
    const unsigned before = desktop->CallsOf(SimulatedOperation::GetWindows);
    EXPECT_EQ(backEnd.captureToIShareFrame(nullptr), Code(-1));
    EXPECT_EQ(desktop->CallsOf(SimulatedOperation::GetWindows), before);
}

TEST_F(DefaultBackEnd, HoldsThePictureBackWhileWindowsMoveOnADesktopShareToo) {
    context->AddSharedDisplay(MAIN);
    EXPECT_EQ(Capture(), 0u);
    desktop->MoveWindow(1, {60, 50});
    EXPECT_EQ(Capture(), Code(-303));
    clock->Advance(std::chrono::milliseconds(500));
    EXPECT_EQ(Capture(), Code(-303));
    EXPECT_EQ(PixelAt(*frame.Get(), 50, 40), Rgb(GREEN)) << "the frame is as it was";
    clock->Advance(std::chrono::milliseconds(1));
    EXPECT_EQ(Capture(), 0u);
    EXPECT_EQ(PixelAt(*frame.Get(), 50, 40), Rgb(0));
    EXPECT_EQ(PixelAt(*frame.Get(), 60, 50), Rgb(GREEN));
}

TEST_F(DefaultBackEnd, GivesTheBackgroundOfAnApplicationWithoutWindows) {
    ShareApp();
    settings->m_nAppShareBackgroundColor = 0x102030;
    EXPECT_EQ(Capture(), 0u);
    EXPECT_EQ(CountOf(*frame.Get(), GREEN), 80 * 40);
    desktop->CloseWindow(1);
    EXPECT_EQ(Capture(), Code(-303)) << "it looks like a move at first";
    clock->Advance(std::chrono::milliseconds(501));
    EXPECT_EQ(Capture(), 0u);
    EXPECT_EQ(CountOf(*frame.Get(), 0x102030), 200 * 120);
}

TEST_F(DefaultBackEnd, FollowsTheDisplayThatItIsGiven) {
    const CTraceLog trace;
    EXPECT_TRUE(backEnd.setCaptureDisplay(SIDE));
    EXPECT_TRUE(backEnd.setCaptureDisplay(SIDE));
    EXPECT_EQ(trace.LinesContaining("Tovel"),
              Lines{Info("[ShareCapturerTovel::initBmpContext] displayid=2 left = 200 top = 10 width = 100 "
                         "height = 50")});
    EXPECT_EQ(backEnd.getFrameSize(), (TVLSize{200, 100}));
    EXPECT_FLOAT_EQ(settings->GetCurrentScale(), 2.0F);
    EXPECT_EQ(Capture(), 0u);
    EXPECT_EQ(frame.Get()->GetMetaInfo().rectCapture, (TVLRect{200, 10, 300, 60}));
    EXPECT_TRUE(backEnd.setCaptureDisplay(SHARE_INVALID_DISPLAY));
    EXPECT_EQ(backEnd.getFrameSize(), (TVLSize{200, 100})) << "no display has no size";
}

TEST_F(DefaultBackEnd, FollowsTheLimitAndTracesEachStep) {
    const CTraceLog trace;
    backEnd.setMaxSize({2880, 1800});
    EXPECT_EQ(trace.Lines(), Lines{}) << "the limit in force";
    backEnd.setMaxSize({100, 60});
    EXPECT_EQ(backEnd.getFrameSize(), (TVLSize{100, 60}));
    EXPECT_FLOAT_EQ(settings->GetCurrentScale(), 0.5F);
    backEnd.setMaxSize({100, 61});
    EXPECT_EQ(
        trace.Lines(),
        (Lines{Info("[ShareCapturerTovel::setMaxSize],m_szMaxCapture:x=2880,y=1800,nMaxSize:x=100,y=60"),
               Info("[ShareCapturerTovel::initBmpContext] displayid=1 left = 0 top = 0 width = 200 "
                    "height = 120"),
               Info("[ShareCapturerTovel::setMaxSize],m_szMaxCapture:x=100,y=60,nMaxSize:x=100,y=61"),
               Info("[ShareCapturerTovel::setMaxSize] no change")}));
    EXPECT_EQ(Capture(), 0u);
    EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{100, 60}));
}

TEST_F(DefaultBackEnd, TellsAChangeOfItsOwnDisplayFromThatOfAnother) {
    const CTraceLog trace;
    EXPECT_EQ(backEnd.onDisplayPlugin(SIDE), 0);
    EXPECT_EQ(backEnd.onDisplayPlugout(SIDE), 0);
    EXPECT_EQ(backEnd.onScreenResolutionChanged(SIDE), 0);
    EXPECT_EQ(trace.Lines(), Lines{});
    EXPECT_EQ(backEnd.onDisplayPlugin(MAIN), 1);
    EXPECT_EQ(backEnd.onDisplayPlugout(MAIN), 1);
    EXPECT_EQ(backEnd.onScreenResolutionChanged(MAIN), 0);
    EXPECT_EQ(trace.Lines(),
              (Lines{Info("[ShareCapturerTovel::onDisplayPlugin] m_nCapturedDisplayId is plugout"),
                     Info("[ShareCapturerTovel::onDisplayPlugout] m_nCapturedDisplayId is plugout"),
                     Info("[ShareCapturerTovel::onScreenResolutionChanged] no change")}));
    desktop->ResizeDisplay(MAIN, {160, 90});
    EXPECT_EQ(backEnd.onScreenResolutionChanged(MAIN), 1);
    EXPECT_EQ(backEnd.getFrameSize(), (TVLSize{160, 90}));
    EXPECT_EQ(backEnd.getCaptureRect(), Rect(0, 0, 160, 90));
}

TEST_F(DefaultBackEnd, HasTheSizeOfADisplayThatCameBackWithAnotherOne) {
    backEnd.setCaptureDisplay(SIDE);
    desktop->RemoveDisplay(SIDE);
    backEnd.setMaxSize({1000, 1000}); // its sizes are worked out while there is none
    EXPECT_EQ(Capture(), Code(-1));
    SimulatedDisplay back;
    back.id = SIDE;
    back.bounds = Rect(200, 0, 60, 40);
    desktop->AddDisplay(back);
    EXPECT_EQ(backEnd.onDisplayPlugin(SIDE), 1);
    EXPECT_EQ(Capture(), 0u);
    EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{60, 40}));
}

TEST_F(DefaultBackEnd, ForgetsASharedApplicationThatEnds) {
    ShareApp();
    CTally heard;
    NSWorkspace::sharedWorkspace()->notificationCenter()->addObserver(
        &heard, [&](const NSNotification&) { heard.Add(); }, NSWorkspaceDidTerminateApplicationNotification);
    desktop->EndApplication(EDITOR);
    EXPECT_TRUE(heard.Reaches(1));
    NSWorkspace::sharedWorkspace()->notificationCenter()->removeObserver(&heard);
    EXPECT_EQ(context->GetSharedAppCount(), 0);
}
