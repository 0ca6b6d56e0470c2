// SPDX-License-Identifier: Apache-2.0
#include "src/mac/cgs_composition.h"

#include "src/mac/share_capturer_context_mac.h"
#include "tests/src/mac/backend_tools.h"
#include "tests/support/engine_bench.h"

#include <screenshare/share_capturer.h>

#include <gtest/gtest.h>

#include <string>
#include <vector>

using namespace platform;

namespace {

constexpr unsigned DISPLAY = 1;
constexpr pid_t EDITOR = 5'000'100;
constexpr pid_t NOTES = 5'000'200;
constexpr std::uint32_t RED = 0xFF0000;
constexpr std::uint32_t GREEN = 0x00FF00;
constexpr std::uint32_t BLUE = 0x0000FF;
constexpr std::uint32_t WHITE = 0xFFFFFF;
constexpr std::uint32_t BACKGROUND = 0x123456;

CGRect Rect(float x, float y, float width, float height) {
    return {{x, y}, {width, height}};
}

/// A wallpaper, the editor's window in the middle, that of the notes in front of a part of it.
Scene Desk() {
    return Scene()
        .Display(0, 0, 200, 120)
        .App(1, "Desktop")
        .Window(1)
        .At(0, 0, 200, 120)
        .Colour(BLUE)
        .Level(SIMULATED_LEVEL_DESKTOP)
        .App(EDITOR, "Editor")
        .Window(2)
        .At(50, 40, 80, 40)
        .Colour(GREEN)
        .App(NOTES, "Notes")
        .Window(3)
        .At(100, 60, 60, 40)
        .Colour(RED)
        .Pointer(1000, 1000)
        .Cursor(SquareCursor(WHITE));
}

class Composition : public testing::Test {
protected:
    /// Shares applications from now on.
    void ShareApps(std::initializer_list<pid_t> pids) {
        context->AddSharedDisplay(DISPLAY);
        for (const pid_t pid : pids)
            context->AddSharedApp(static_cast<unsigned>(pid));
        context->SetShareType(SHARE_TYPE_APP);
        settings->m_nAppShareBackgroundColor = BACKGROUND;
        context->UpdateShareCapturerContext();
    }
    int Capture(TVLSize bitmap = {200, 120}) { return Capture(bitmap, bitmap); }
    int Capture(TVLSize bitmap, TVLSize picture) {
        return capturer.capture(frame.Get(), DISPLAY, bitmap, picture);
    }
    FramePixel At(int x, int y) { return PixelAt(*frame.Get(), x, y); }
    IShareFrame::MetaInfo Meta() { return frame.Get()->GetMetaInfo(); }

    CSettingsScope settings;
    CServedScene desktop{Desk()};
    std::shared_ptr<ShareCapturerContext> context = std::make_shared<ShareCapturerContextMac>();
    CShareCGSCapturer capturer{context};
    FrameRef frame = NewFrameRef();
};

struct Sizes {
    TVLSize bitmap;
    TVLSize capture;
};

Sizes CaptureSizes(TVLSize source, TVLSize max) {
    Sizes sizes{};
    CShareCGSCapturer::calcCaptureSize(source, max, sizes.bitmap, sizes.capture);
    return sizes;
}

} // namespace

// ---- Sizes

TEST_F(Composition, IgnoresTheLimitWithoutResampling) {
    const CServedScene fine(Scene().Display(0, 0, 1440, 900).Scale(2));
    settings->m_bCaptureResampleEnable = false;
    settings->m_bCaptureResampleFixSizeEnable = true;
    CGRect rect;
    Sizes sizes{};
    CShareCGSCapturer::calcScreenSize(DISPLAY, {100, 100}, rect, sizes.bitmap, sizes.capture);
    EXPECT_EQ(sizes.bitmap, (TVLSize{2880, 1800}));
    EXPECT_EQ(sizes.capture, (TVLSize{2880, 1800}));
    EXPECT_EQ(rect, Rect(0, 0, 1440, 900));
}

TEST_F(Composition, FitsThePictureIntoTheLimit) {
    const Sizes sizes = CaptureSizes({2880, 1800}, {1920, 1080});
    EXPECT_EQ(sizes.bitmap, (TVLSize{1728, 1080}));
    EXPECT_EQ(sizes.capture, sizes.bitmap);
    EXPECT_EQ(CaptureSizes({640, 480}, {1920, 1080}).bitmap, (TVLSize{640, 480}));
}

TEST_F(Composition, KeepsTheRatioOfThePictureInAFixedSize) {
    settings->m_bCaptureResampleFixSizeEnable = true;
    struct Case {
        TVLSize source;
        TVLSize capture;
    };
    for (const Case& each :
         {Case{{2880, 1800}, {1728, 1080}}, Case{{3000, 1000}, {1920, 640}}, Case{{1920, 1080}, {1920, 1080}},
          Case{{100, 300}, {360, 1080}}, Case{{7, 3}, {1920, 822}}, Case{{0, 0}, {0, 1080}}}) {
        const Sizes sizes = CaptureSizes(each.source, {10, 10});
        EXPECT_EQ(sizes.bitmap, (TVLSize{1920, 1080}));
        EXPECT_EQ(sizes.capture, each.capture) << each.source.cx;
    }
    settings->m_nResampleScreenCaptureWidth = 1;
    settings->m_nResampleScreenCaptureHeight = 1;
    EXPECT_EQ(CaptureSizes({1600, 900}, {}).bitmap, (TVLSize{800, 600}));
    EXPECT_EQ(CaptureSizes({1600, 900}, {}).capture, (TVLSize{800, 450}));
}

TEST_F(Composition, GivesADisplayThatIsGoneNoSize) {
    CGRect rect = Rect(1, 2, 3, 4);
    Sizes sizes{{9, 9}, {9, 9}};
    CShareCGSCapturer::calcScreenSize(99, {1920, 1080}, rect, sizes.bitmap, sizes.capture);
    EXPECT_EQ(sizes.bitmap, (TVLSize{0, 0}));
    EXPECT_EQ(rect, CGRect{});
}

// ---- The desktop

TEST_F(Composition, ShowsTheDesktopPixelByPixel) {
    EXPECT_EQ(Capture(), 0);
    EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{200, 120}));
    EXPECT_EQ(frame.Get()->GetFrameDataFormat(), SHARE_FRAME_FORMAT_RGBA);
    EXPECT_EQ(At(49, 40), Rgb(BLUE));
    EXPECT_EQ(At(50, 40), Rgb(GREEN));
    EXPECT_EQ(At(99, 79), Rgb(GREEN));
    EXPECT_EQ(At(100, 60), Rgb(RED));
    EXPECT_EQ(CountOf(*frame.Get(), RED), 60 * 40);
    EXPECT_EQ(CountOf(*frame.Get(), GREEN), 80 * 40 - 30 * 20);
    EXPECT_EQ(Meta().rectCapture, (TVLRect{0, 0, 200, 120}));
}

TEST_F(Composition, ScalesTheDesktopInThatOneDraw) {
    EXPECT_EQ(Capture({100, 60}), 0);
    EXPECT_EQ(At(24, 20), Rgb(BLUE));
    EXPECT_EQ(At(25, 20), Rgb(GREEN));
    EXPECT_EQ(CountOf(*frame.Get(), RED), 30 * 20);
}

TEST_F(Composition, ShowsWhatLiesUnderAWindowThatIsKeptOut) {
    context->AddUnSharedWindow(3);
    EXPECT_EQ(Capture(), 0);
    EXPECT_EQ(CountOf(*frame.Get(), RED), 0);
    EXPECT_EQ(CountOf(*frame.Get(), GREEN), 80 * 40) << "whole";
    context->AddUnSharedApp(static_cast<unsigned>(EDITOR));
    EXPECT_EQ(Capture(), 0);
    EXPECT_EQ(CountOf(*frame.Get(), BLUE), 200 * 120);
}

TEST_F(Composition, ShowsASharedWindowOfAnApplicationThatIsKeptOutAndOneOfNobody) {
    context->AddUnSharedApp(static_cast<unsigned>(EDITOR));
    context->AddSharedWindow(2);
    desktop->SetOwner(3, 0);
    EXPECT_EQ(Capture(), 0);
    EXPECT_EQ(CountOf(*frame.Get(), RED), 60 * 40);
    EXPECT_EQ(CountOf(*frame.Get(), GREEN), 80 * 40 - 30 * 20);
}

TEST_F(Composition, LeavesNothingOfAnEarlierPictureWhereNoWindowIsAnyMore) {
    EXPECT_EQ(Capture(), 0);
    context->AddUnSharedApp(1); // the wallpaper
    context->AddUnSharedWindow(3);
    EXPECT_EQ(Capture(), 0);
    EXPECT_EQ(CountOf(*frame.Get(), GREEN), 80 * 40);
    EXPECT_EQ(CountOf(*frame.Get(), 0), 200 * 120 - 80 * 40);
    context->AddUnSharedWindow(2);
    EXPECT_EQ(Capture(), 0) << "no window at all is no failure";
    EXPECT_EQ(CountOf(*frame.Get(), 0), 200 * 120);
    EXPECT_EQ(Meta().rectCapture, (TVLRect{0, 0, 200, 120}));
    EXPECT_FALSE(Meta().bPointerCaptured);
}

TEST_F(Composition, LeavesNothingOfAnEarlierPictureBesideASmallerOne) {
    EXPECT_EQ(Capture(), 0);
    EXPECT_EQ(Capture({200, 120}, {100, 60}), 0);
    EXPECT_EQ(At(49, 30), Rgb(0));
    EXPECT_EQ(At(50, 30), Rgb(BLUE));
    EXPECT_EQ(CountOf(*frame.Get(), 0), 200 * 120 - 100 * 60);
}

TEST_F(Composition, CentresThePictureWithHalfOfAnOddDifferenceCutOff) {
    EXPECT_EQ(Capture({203, 125}, {200, 120}), 0);
    EXPECT_EQ(At(0, 60), Rgb(0));
    EXPECT_EQ(At(1, 60), Rgb(BLUE));
    EXPECT_EQ(At(200, 60), Rgb(BLUE));
    EXPECT_EQ(At(201, 60), Rgb(0));
    EXPECT_EQ(At(60, 2), Rgb(0)) << "2 rows are free at the bottom, where it counts from, so 3 at the top";
    EXPECT_EQ(At(60, 3), Rgb(BLUE));
    EXPECT_EQ(At(60, 122), Rgb(BLUE));
    EXPECT_EQ(At(60, 123), Rgb(0));
}

TEST_F(Composition, KeepsWindowsThatReachBeyondTheDisplayOutOfTheFreeEdges) {
    desktop->SetFrame(3, Rect(-50, -30, 300, 180));
    EXPECT_EQ(Capture({240, 160}, {200, 120}), 0);
    EXPECT_EQ(CountOf(*frame.Get(), RED), 200 * 120);
    EXPECT_EQ(CountOf(*frame.Get(), 0), 240 * 160 - 200 * 120);
}

TEST_F(Composition, ShowsOnlyTheDisplayThatIsAskedFor) {
    SimulatedDisplay second;
    second.id = 2;
    second.bounds = Rect(200, 0, 100, 50);
    desktop->AddDisplay(second);
    SimulatedWindow window;
    window.info.frame = Rect(190, 10, 20, 10);
    window.content = SimulatedContent::Colour(WHITE);
    desktop->AddWindow(window);
    EXPECT_EQ(capturer.capture(frame.Get(), 2, {100, 50}, {100, 50}), 0);
    EXPECT_EQ(CountOf(*frame.Get(), WHITE), 10 * 10);
    EXPECT_EQ(At(9, 10), Rgb(WHITE));
    EXPECT_EQ(At(10, 10), Rgb(0));
    EXPECT_EQ(Meta().rectCapture, (TVLRect{200, 0, 300, 50}));
}

TEST_F(Composition, SharesEverythingWithoutAContext) {
    CShareCGSCapturer alone(nullptr);
    EXPECT_TRUE(alone.isDesktopSharing());
    EXPECT_TRUE(alone.isWindowShared(3));
    EXPECT_EQ(alone.capture(frame.Get(), DISPLAY, {200, 120}, {200, 120}), 0);
    EXPECT_EQ(CountOf(*frame.Get(), RED), 60 * 40);
}

// ---- Failures

TEST_F(Composition, RefusesNoFrame) {
    EXPECT_EQ(capturer.capture(nullptr, DISPLAY, {200, 120}, {200, 120}), -1);
    EXPECT_EQ(desktop->CallsOf(SimulatedOperation::TakeWindowPicture), 0u);
}

TEST_F(Composition, LeavesTheFrameAsItWasWhenThereIsNoPicture) {
    EXPECT_EQ(Capture(), 0);
    for (const PictureOutcome outcome :
         {PictureOutcome::Failed, PictureOutcome::Stale, PictureOutcome::Timeout, PictureOutcome::Gone}) {
        desktop->FailAlways(SimulatedOperation::TakeWindowPicture, outcome);
        EXPECT_EQ(Capture({100, 60}), -1);
        desktop->Heal(SimulatedOperation::TakeWindowPicture);
        EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{200, 120}));
        EXPECT_EQ(CountOf(*frame.Get(), RED), 60 * 40);
    }
    EXPECT_EQ(Capture({100, 60}), 0);
}

TEST_F(Composition, HasNoPictureOfADisplayThatIsGone) {
    EXPECT_EQ(capturer.capture(frame.Get(), 99, {200, 120}, {200, 120}), -1);
}

TEST_F(Composition, PaintsNothingAndKeepsNothingInMemoryThatIsTooShort) {
    std::vector<unsigned char> memory(200 * 120 * 4, 0xAB);
    capturer.initCapturerByData(memory.data(), memory.size() - 1, {200, 120});
    EXPECT_EQ(std::count(memory.begin(), memory.end(), 0), 200 * 120 * 4 - 1);
    EXPECT_EQ(memory.back(), 0xAB);
}

TEST_F(Composition, FollowsTheFrameToAnotherMemoryAndSize) {
    EXPECT_EQ(Capture(), 0);
    const FrameRef first = frame;
    frame = NewFrameRef();
    context->AddUnSharedWindow(3);
    EXPECT_EQ(Capture({50, 30}), 0);
    EXPECT_EQ(CountOf(*frame.Get(), GREEN), 20 * 10);
    EXPECT_EQ(CountOf(*first.Get(), RED), 60 * 40) << "the one before is left alone";
    frame = first;
    EXPECT_EQ(Capture(), 0);
    EXPECT_EQ(CountOf(*frame.Get(), RED), 0);
}

// ---- The pointer

TEST_F(Composition, DrawsThePointerAtItsPlace) {
    desktop->SetPointer(CGPoint{20, 10});
    EXPECT_EQ(Capture(), 0);
    EXPECT_TRUE(capturer.PointerCaptured());
    EXPECT_TRUE(Meta().bPointerCaptured);
    EXPECT_EQ(At(20, 10), Rgb(WHITE));
    EXPECT_EQ(At(23, 13), Rgb(WHITE));
    EXPECT_EQ(CountOf(*frame.Get(), WHITE), 16);
}

TEST_F(Composition, ScalesThePointerByTheScaleInForceAndNotWithTheCentring) {
    settings->m_fCurrentScale = 0.5F;
    desktop->SetPointer(CGPoint{40, 20});
    EXPECT_EQ(Capture({120, 60}, {100, 60}), 0);
    EXPECT_EQ(At(20, 10), Rgb(WHITE));
    EXPECT_EQ(CountOf(*frame.Get(), WHITE), 4);
}

TEST_F(Composition, NeedsNoPointerFromElsewhere) {
    for (const CGPoint& elsewhere : {CGPoint{-1, 0}, CGPoint{200, 10}, CGPoint{10, 120}}) {
        desktop->SetPointer(elsewhere);
        EXPECT_EQ(Capture(), 0);
        EXPECT_TRUE(Meta().bPointerCaptured);
        EXPECT_EQ(CountOf(*frame.Get(), WHITE), 0);
    }
    desktop->SetPointer(std::nullopt);
    EXPECT_EQ(Capture(), 0);
    EXPECT_TRUE(capturer.PointerCaptured());
}

TEST_F(Composition, LeavesThePointerOutWhenItIsToldTo) {
    settings->m_nShareConfigFlags = SHARE_CONFIG_FLAG_NO_POINTER;
    desktop->SetPointer(CGPoint{20, 10});
    EXPECT_EQ(Capture(), 0);
    EXPECT_FALSE(Meta().bPointerCaptured);
    EXPECT_EQ(CountOf(*frame.Get(), WHITE), 0);
    desktop->SetPointer(CGPoint{500, 10});
    EXPECT_EQ(Capture(), 0);
    EXPECT_TRUE(Meta().bPointerCaptured) << "elsewhere, nothing is missing";
}

TEST_F(Composition, TellsThatThePointerIsMissingWithoutItsImage) {
    desktop->SetPointer(CGPoint{20, 10});
    EXPECT_EQ(Capture(), 0);
    desktop->SetCursor(std::nullopt);
    EXPECT_EQ(Capture(), 0);
    EXPECT_FALSE(Meta().bPointerCaptured);
}

// ---- Applications

TEST_F(Composition, ShowsAnApplicationAtItsPlaceOnTheBackground) {
    ShareApps({EDITOR});
    EXPECT_EQ(Capture(), 0);
    EXPECT_EQ(CountOf(*frame.Get(), GREEN), 80 * 40) << "whole, though it is covered";
    EXPECT_EQ(CountOf(*frame.Get(), BACKGROUND), 200 * 120 - 80 * 40);
    EXPECT_EQ(At(50, 40), Rgb(GREEN));
    EXPECT_EQ(At(129, 79), Rgb(GREEN));
    EXPECT_EQ(Meta().rectCapture, (TVLRect{0, 0, 200, 120}));
}

TEST_F(Composition, PutsAWindowOfTheTopLeftCornerAtTheTopOfTheFrame) {
    desktop->SetFrame(2, Rect(0, 0, 40, 24));
    ShareApps({EDITOR});
    EXPECT_EQ(Capture({100, 60}), 0);
    EXPECT_EQ(At(0, 0), Rgb(GREEN));
    EXPECT_EQ(At(19, 11), Rgb(GREEN));
    EXPECT_EQ(CountOf(*frame.Get(), GREEN), 20 * 12);
}

TEST_F(Composition, MapsAnApplicationIntoACentredPicture) {
    ShareApps({EDITOR});
    EXPECT_EQ(Capture({140, 60}, {100, 60}), 0);
    EXPECT_EQ(At(20 + 25, 20), Rgb(GREEN));
    EXPECT_EQ(At(20 + 24, 20), Rgb(BACKGROUND));
    EXPECT_EQ(CountOf(*frame.Get(), GREEN), 40 * 20);
}

TEST_F(Composition, GivesThePlainBackgroundWhenNoWindowIsLeft) {
    ShareApps({EDITOR});
    EXPECT_EQ(Capture(), 0);
    desktop->CloseWindow(2);
    context->UpdateShareCapturerContext();
    EXPECT_EQ(Capture(), 0);
    EXPECT_EQ(CountOf(*frame.Get(), BACKGROUND), 200 * 120);
    EXPECT_EQ(Meta().rectCapture, (TVLRect{0, 0, 200, 120}));
}

TEST_F(Composition, CutsTheFrameToTheWindowsIfThatIsWanted) {
    context->m_bNoWindowBaseArea = false;
    capturer.setMaxSize({1920, 1080});
    desktop->SetPointer(CGPoint{60, 45});
    ShareApps({EDITOR});
    EXPECT_EQ(Capture(), 0);
    EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{80, 40}));
    EXPECT_EQ(CountOf(*frame.Get(), GREEN), 80 * 40 - 16);
    EXPECT_EQ(At(10, 5), Rgb(WHITE));
    EXPECT_EQ(Meta().rectCapture, (TVLRect{50, 40, 130, 80}));
    capturer.setMaxSize({40, 40});
    EXPECT_EQ(Capture(), 0);
    EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{40, 20}));
    EXPECT_FLOAT_EQ(AppShareConfig::Instance()->GetCurrentScale(), 0.5F);
}

TEST_F(Composition, KeepsTheLastSizeOfAFrameThatIsCutToWindowsThatAreGone) {
    context->m_bNoWindowBaseArea = false;
    capturer.setMaxSize({1920, 1080});
    ShareApps({EDITOR});
    desktop->SetOnScreen(2, false);
    context->UpdateShareCapturerContext();
    EXPECT_EQ(Capture(), 0);
    EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{200, 120})) << "at first the display's";
    desktop->SetOnScreen(2, true);
    context->UpdateShareCapturerContext();
    EXPECT_EQ(Capture(), 0);
    desktop->CloseWindow(2);
    context->UpdateShareCapturerContext();
    EXPECT_EQ(Capture(), 0);
    EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{80, 40}));
    EXPECT_EQ(CountOf(*frame.Get(), BACKGROUND), 80 * 40);
    EXPECT_EQ(Meta().rectCapture, (TVLRect{50, 40, 130, 80}));
}

// ---- Its parts

TEST_F(Composition, ListsTheSharedWindowsFrontFirst) {
    std::vector<int> windows{9, 9};
    EXPECT_TRUE(capturer.getCaptureWindows(windows));
    EXPECT_EQ(windows, (std::vector<int>{3, 2, 1}));
    context->AddUnSharedWindow(2);
    EXPECT_TRUE(capturer.getCaptureWindows(windows));
    EXPECT_EQ(windows, (std::vector<int>{3, 1}));
}

TEST_F(Composition, HasNoImageOfNoWindows) {
    const unsigned window = 2;
    CGRect rect;
    EXPECT_EQ(capturer.createScreenShot(nullptr, 1, Rect(0, 0, 9, 9), rect), nullptr);
    EXPECT_EQ(capturer.createScreenShot(&window, 0, Rect(0, 0, 9, 9), rect), nullptr);
    EXPECT_EQ(CShareCGSCapturer::captureRect(nullptr, 1, Rect(0, 0, 9, 9), true), nullptr);
    EXPECT_EQ(CShareCGSCapturer::captureRect(&window, 0, Rect(0, 0, 9, 9), true), nullptr);
    const CGImageRef image = CShareCGSCapturer::captureRect(&window, 1, Rect(50, 40, 9, 8), true);
    EXPECT_EQ(CGImageGetWidth(image.get()), 9);
    EXPECT_EQ(CGImageGetHeight(image.get()), 8);
}

TEST_F(Composition, BoxesWhatWindowsHaveInARectangle) {
    const auto box = [](std::vector<CGWindowID> windows, const CGRect& rect) {
        return CShareCGSCapturer::getAppRect(windows, rect);
    };
    EXPECT_EQ(box({2, 3}, Rect(0, 0, 200, 120)), Rect(50, 40, 110, 60));
    EXPECT_EQ(box({3, 2}, Rect(0, 0, 120, 70)), Rect(50, 40, 70, 30));
    EXPECT_EQ(box({2}, Rect(0, 0, 10, 10)), Rect(0, 0, 0, 0));
    EXPECT_EQ(box({77}, Rect(30, 20, 10, 10)), Rect(30, 20, 0, 0)) << "clamped by components";
    EXPECT_EQ(box({}, Rect(-30, -20, 10, 10)), Rect(0, 0, 0, 0));
}

TEST_F(Composition, BoxesTheWindowsItselfWhenTheWalkHasNoBox) {
    const unsigned list[] = {2, 3};
    context->SetShareType(SHARE_TYPE_APP);
    CGRect rect;
    EXPECT_NE(capturer.createScreenShot(list, 2, Rect(0, 0, 200, 120), rect), nullptr);
    EXPECT_EQ(rect, Rect(50, 40, 110, 60));
    rect = Rect(60, 50, 10, 10);
    EXPECT_NE(capturer.createScreenShot(list, 2, Rect(0, 0, 200, 120), rect), nullptr);
    EXPECT_EQ(rect, Rect(60, 50, 10, 10));
}

TEST_F(Composition, TellsHowLongDrawingTookWhenThatIsWanted) {
    const CTraceLog trace;
    EXPECT_EQ(Capture(), 0);
    EXPECT_FALSE(trace.Contains("[Performance]"));
    settings->m_nShareConfigFlags = SHARE_CONFIG_FLAG_PERFORMANCE_TRACE;
    CManualClockScope clock;
    EXPECT_EQ(Capture(), 0);
    EXPECT_EQ(trace.LinesContaining("[Performance]"),
              std::vector<std::string>{Info("[Performance]CShareCGSCapturer.CGContextDrawImage usagetime=0 "
                                            "image={w=200 h=120} destRect={x=0 y=0 w=200 h=120}")});
}
