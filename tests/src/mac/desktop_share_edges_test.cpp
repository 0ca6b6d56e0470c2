// SPDX-License-Identifier: Apache-2.0
#include "platform/app_kit.h"
#include "src/mac/share_capturer_context_mac.h"
#include "src/mac/share_capturer_desktop_mac.h"
#include "src/mac/share_capturer_tovel.h"
#include "src/share_source.h"
#include "tests/src/mac/backend_tools.h"
#include "tests/support/engine_bench.h"

#include <screenshare/share_capturer.h>

#include <gtest/gtest.h>

#include <string>
#include <vector>

// The ends of what a desktop capturer and its back-end promise.

using namespace platform;

namespace {

constexpr unsigned MAIN = 1;
constexpr unsigned SIDE = 2;
constexpr pid_t EDITOR = 5'000'100;
constexpr std::uint32_t GREEN = 0x00FF00;
constexpr std::uint32_t BLUE = 0x0000FF;
constexpr std::uint32_t WHITE = 0xFFFFFF;

/// A fine display beside a plain one.
Scene Desk() {
    return Scene()
        .Display(0, 0, 1440, 900)
        .Scale(2)
        .Display(1440, 0, 203, 120)
        .App(1, "Desktop")
        .Window(1)
        .At(0, 0, 1643, 900)
        .Colour(BLUE)
        .Level(SIMULATED_LEVEL_DESKTOP)
        .App(EDITOR, "Editor")
        .Window(2)
        .At(100, 50, 80, 40)
        .Colour(GREEN)
        .Pointer(5000, 5000)
        .Cursor(SquareCursor(WHITE));
}

class DesktopShareEdges : public testing::Test {
protected:
    DesktopShareEdges() { EXPECT_TRUE(backEnd.init(context)); }

    unsigned Capture() { return backEnd.captureToIShareFrame(frame.Get()); }
    FramePixel At(int x, int y) { return PixelAt(*frame.Get(), x, y); }
    std::vector<unsigned> SharedMonitors() const {
        std::vector<unsigned> displays;
        context->GetSharedMonitors(displays);
        return displays;
    }

    CManualClockScope clock;
    CSettingsScope settings;
    CServedScene desktop{Desk()};
    std::shared_ptr<ShareCapturerContext> context = std::make_shared<ShareCapturerContextMac>();
    ShareCapturerTovel backEnd;
    FrameRef frame = NewFrameRef();
};

} // namespace

// ---- Sizes

TEST_F(DesktopShareEdges, StartWithALimitThatAFineDisplayJustFitsInto) {
    EXPECT_EQ(Capture(), 0u);
    EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{2880, 1800}));
    EXPECT_EQ(At(199, 100), Rgb(BLUE));
    EXPECT_EQ(At(200, 100), Rgb(GREEN));
    EXPECT_EQ(At(359, 179), Rgb(GREEN));
    EXPECT_EQ(At(360, 179), Rgb(BLUE));
    EXPECT_FLOAT_EQ(settings->GetCurrentScale(), 2.0F);
}

TEST_F(DesktopShareEdges, PutAFineDisplayIntoTheMiddleOfAFullHdFrame) {
    settings->m_bCaptureResampleFixSizeEnable = true;
    backEnd.setMaxSize({10, 10}); // has it look at its sizes again
    EXPECT_EQ(Capture(), 0u);
    EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{1920, 1080}));
    EXPECT_EQ(At(95, 0), Rgb(0));
    EXPECT_EQ(At(96, 0), Rgb(BLUE));
    EXPECT_EQ(At(96 + 1727, 1079), Rgb(BLUE));
    EXPECT_EQ(At(96 + 1728, 1079), Rgb(0));
    EXPECT_EQ(At(96 + 168, 84), Rgb(GREEN)) << "1.2 pixels a point";
}

TEST_F(DesktopShareEdges, WorkNothingOutForTheLimitThatIsInForceAlready) {
    backEnd.setMaxSize({1440, 900});
    EXPECT_EQ(backEnd.getFrameSize(), (TVLSize{1440, 900}));
    settings->m_fCurrentScale = 0.75F;
    desktop->ResizeDisplay(MAIN, {1000, 500}); // nobody tells the back-end
    const CTraceLog trace;
    backEnd.setMaxSize({1440, 900});
    EXPECT_EQ(trace.Lines(), std::vector<std::string>{});
    EXPECT_EQ(backEnd.getFrameSize(), (TVLSize{1440, 900}));
    EXPECT_EQ(backEnd.getCaptureRect(), (CGRect{{0, 0}, {1440, 900}}));
    EXPECT_FLOAT_EQ(settings->GetCurrentScale(), 0.75F);
}

TEST_F(DesktopShareEdges, CutOddSizesDownToWholePixels) {
    backEnd.setCaptureDisplay(SIDE);
    backEnd.setMaxSize({100, 100});
    EXPECT_EQ(Capture(), 0u);
    const TVLSize size = SizeOf(*frame.Get());
    EXPECT_EQ(size.cx, 100);
    EXPECT_EQ(size.cy, 59) << "59.11 and no more";
    EXPECT_EQ(At(99, 58), Rgb(BLUE));
    EXPECT_EQ(frame.Get()->GetMetaInfo().rectCapture, (TVLRect{1440, 0, 1643, 120}));
}

TEST_F(DesktopShareEdges, ForgetTheLineLengthThatAFrameCameWith) {
    backEnd.setCaptureDisplay(SIDE);
    frame.Get()->SetFrameSize(203, 120);
    frame.Get()->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    EXPECT_EQ(frame.Get()->SetFrameLineBytes(1000), 0);
    EXPECT_EQ(Capture(), 0u);
    EXPECT_EQ(frame.Get()->GetFrameLineBytes(), 203 * 4);
    EXPECT_EQ(CountOf(*frame.Get(), BLUE), 203 * 120);
}

// ---- The pointer

TEST_F(DesktopShareEdges, PutThePointerWhereItIsInPixels) {
    desktop->SetPointer(CGPoint{20, 10});
    EXPECT_EQ(Capture(), 0u);
    EXPECT_EQ(At(39, 20), Rgb(BLUE));
    EXPECT_EQ(At(40, 20), Rgb(WHITE));
    EXPECT_EQ(At(47, 27), Rgb(WHITE)) << "twice as large";
    EXPECT_EQ(CountOf(*frame.Get(), WHITE), 8 * 8);
    backEnd.setMaxSize({720, 450});
    EXPECT_EQ(Capture(), 0u);
    EXPECT_EQ(At(10, 5), Rgb(WHITE));
    EXPECT_EQ(CountOf(*frame.Get(), WHITE), 2 * 2);
    EXPECT_EQ(backEnd.pointerCaptured(), 1);
}

TEST_F(DesktopShareEdges, FindThePointerOnTheDisplayThatIsCapturedAndNoOther) {
    desktop->SetPointer(CGPoint{1440, 0});
    EXPECT_EQ(Capture(), 0u);
    EXPECT_EQ(CountOf(*frame.Get(), WHITE), 0) << "a pixel beyond the right edge";
    EXPECT_EQ(backEnd.pointerCaptured(), 1);
    backEnd.setCaptureDisplay(SIDE);
    EXPECT_EQ(Capture(), 0u);
    EXPECT_EQ(At(0, 0), Rgb(WHITE));
}

// ---- What is shared

TEST_F(DesktopShareEdges, KeepTheListOfApplicationsWhenOneEnds) {
    context->AddSharedApp(static_cast<unsigned>(EDITOR));
    CTally heard;
    NSWorkspace::sharedWorkspace()->notificationCenter()->addObserver(
        &heard, [&](const NSNotification&) { heard.Add(); }, NSWorkspaceDidTerminateApplicationNotification);
    context->SetShareType(SHARE_TYPE_DESKTOP);
    desktop->EndApplication(EDITOR);
    EXPECT_TRUE(heard.Reaches(1));
    NSWorkspace::sharedWorkspace()->notificationCenter()->removeObserver(&heard);
    EXPECT_EQ(context->GetSharedAppCount(), 1) << "only shares of applications end with them";
}

TEST_F(DesktopShareEdges, ListAgainWhatWasFilteredOutBeforeABackEndWasMade) {
    context->SetFilterSelf(false);
    EXPECT_FALSE(context->IsAppUnShared(static_cast<unsigned>(getpid())));
    ShareCapturerTovel other;
    EXPECT_TRUE(other.init(context));
    EXPECT_TRUE(context->IsAppUnShared(static_cast<unsigned>(getpid())));
}

TEST_F(DesktopShareEdges, LeaveTheChoiceOfAMonitorAloneWhenAnotherIsRefused) {
    CShareCapturerDesktopMac capturer(context);
    EXPECT_EQ(capturer.SelectSharedDisplay(SIDE), 0);
    ShareSourceInfo application;
    application.sourceId = MAIN;
    application.eType = SHARE_SOURCE_TYPE_APP;
    const ShareRef<CShareSource> source(new CShareSource);
    source.Get()->SetInfo(&application);
    EXPECT_EQ(capturer.SelectSharedDisplay(SHARE_INVALID_DISPLAY), -2);
    EXPECT_EQ(capturer.AddCaptureShareSource(source.Get()), -1);
    EXPECT_EQ(capturer.AddCaptureShareSource(nullptr), -1);
    EXPECT_EQ(SharedMonitors(), std::vector<unsigned>{SIDE});
    EXPECT_EQ(capturer.GetCurrentCaptureDisplayId(), SIDE);
    EXPECT_EQ(capturer.GetCaptureShareSourceCount(), 0);
}

TEST_F(DesktopShareEdges, CaptureNothingAndAskNothingWithoutAFrame) {
    CShareCapturerDesktopMac capturer(context);
    EXPECT_EQ(capturer.Capture(frame.Get()), 0);
    desktop->MoveWindow(2, {300, 300});
    const unsigned before = desktop->CallsOf(SimulatedOperation::GetWindows);
    EXPECT_EQ(capturer.Capture(nullptr), -1);
    EXPECT_EQ(desktop->CallsOf(SimulatedOperation::GetWindows), before);
}
