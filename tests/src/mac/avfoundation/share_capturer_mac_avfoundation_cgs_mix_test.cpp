// SPDX-License-Identifier: Apache-2.0
#include "src/mac/avfoundation/share_capturer_mac_avfoundation_cgs_mix.h"

#include "src/mac/share_util_mac.h"
#include "src/share_util.h"
#include "tests/src/mac/avfoundation/session_bench.h"

// The session's picture with the shared windows drawn again where something else covers them. What it has in
// common with the flat fills is in share_capturer_session_test.cpp.

using namespace platform;

namespace {

class MixBackEnd : public SessionBench {
protected:
    MixBackEnd() : SessionBench(MIX_BACK_END) {}

    /// Every pixel of a rectangle in frame coordinates.
    void ExpectFilled(const TVLRect& rect, std::uint32_t rgb) {
        EXPECT_EQ(CountIn(rect, rgb), (rect.right - rect.left) * (rect.bottom - rect.top));
    }
    /// What it traces when it draws one rectangle of the overlap.
    static std::string DrawLine(const TVLRect& item, const TVLRect& extended, const std::string& image,
                                const CGRect& target) {
        return Detail(
            "ShareCapturerAVFoundationCGSMix.CGContextDrawImage rcItem=" + ShareUtil::TVLRectToString(item) +
            " rcItemExtend=" + ShareUtil::TVLRectToString(extended) + " image=" + image +
            " destRect=" + ShareUtilMac::CGRectToString(target));
    }
    static Lines DrawLines(const CTraceLog& trace) { return trace.LinesContaining("rcItem="); }
    /// A share of the desktop where just this rectangle is hidden.
    void Hide(float x, float y, float width, float height) {
        desktop->SetFrame(SECRET, Rect(x, y, width, height));
        Tick();
        KeepSecretsOut();
    }
    void ShowPointerAt(CGPoint position) {
        desktop->SetCursor(SquareCursor(WHITE));
        desktop->SetPointer(position);
    }
};

} // namespace

// ---- Its life

TEST_F(MixBackEnd, TracesNothingOfItsOwnWhenItBeginsAndEnds) {
    const CTraceLog trace;
    {
        ShareCapturerAVFoundationCGSMix other;
        EXPECT_TRUE(other.init(context));
        other.initScreenSize();
        other.initCapturerByData(nullptr, 0);
        EXPECT_TRUE(other.setCaptureDisplay(SIDE));
    }
    EXPECT_EQ(trace.LinesContaining("ShareCapturerAVFoundationCGSMix"), Lines{});
}

TEST_F(MixBackEnd, TakesEveryDisplayWhateverTheSessionSays) {
    EXPECT_TRUE(backEnd->setCaptureDisplay(77));
    EXPECT_EQ(backEnd->getCaptureDisplay(), 77u);
    script->Do(Operation::StartRunning, [] { throw std::runtime_error("stuck"); });
    EXPECT_TRUE(backEnd->setCaptureDisplay(SIDE));
    EXPECT_EQ(backEnd->getCaptureDisplay(), SIDE);
}

TEST_F(MixBackEnd, LeavesTheFrameOfAPassWithoutAPictureAlone) {
    EXPECT_EQ(Show(), OK);
    IShareFrame::MetaInfo other{};
    other.rectCapture = {1, 2, 3, 4};
    frame.Get()->SetMetaInfo(other);
    frame.Get()->SetTimestamp(4711);
    EXPECT_EQ(Pass(), NO_DATA);
    script->Fail(Operation::LockBaseAddress);
    EXPECT_EQ(Show(), FAILED);
    EXPECT_EQ(Meta().rectCapture, other.rectCapture);
    EXPECT_EQ(frame.Get()->GetTimestamp(), 4711u);
}

// ---- What it draws

TEST_F(MixBackEnd, ShowsADesktopThatNothingIsKeptOutOfAsItIs) {
    const unsigned before = desktop->CallsOf(DesktopOperation::TakeWindowPicture);
    EXPECT_EQ(Show(), OK);
    ExpectFilled({100, 60, 160, 100}, RED);
    EXPECT_EQ(Count(green), TEXT_PIXELS - TEXT_UNDER_SECRET);
    EXPECT_EQ(Count(BLUE), ALL_PIXELS - SECRET_PIXELS - TEXT_PIXELS + TEXT_UNDER_SECRET);
    EXPECT_EQ(desktop->CallsOf(DesktopOperation::TakeWindowPicture), before) << "there is nothing to draw";
}

TEST_F(MixBackEnd, DrawsWhatIsCoveredOnADesktop) {
    KeepSecretsOut();
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(CountReddish(), 0);
    EXPECT_EQ(Count(green), TEXT_PIXELS) << "whole, also under the secret";
    EXPECT_EQ(Count(BLUE), ALL_PIXELS - TEXT_PIXELS);
}

TEST_F(MixBackEnd, DrawsWhatIsCoveredOfAnApplicationOnItsBackground) {
    settings->m_nAppShareBackgroundColor = 0x003344;
    settings->m_nOverlapFillColor = 0x001122;
    ShareEditor();
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(Count(green), TEXT_PIXELS);
    EXPECT_EQ(Count(0x003344), ALL_PIXELS - TEXT_PIXELS);
}

TEST_F(MixBackEnd, LeavesBlackWhereThereIsNoPictureOfWhatIsCovered) {
    KeepSecretsOut();
    desktop->FailNext(DesktopOperation::TakeWindowPicture);
    const CTraceLog trace;
    EXPECT_EQ(Show(), OK);
    ExpectFilled({100, 60, 160, 100}, BLACK);
    EXPECT_EQ(Count(BLACK), SECRET_PIXELS);
    const TVLRect item{100, 60, 160, 100};
    EXPECT_EQ(DrawLines(trace), Lines{DrawLine(item, {75, 35, 185, 120}, "null", Rect(75, 0, 110, 85))});
}

TEST_F(MixBackEnd, LeavesBlackUnderWhatIsCoveredAndTranslucent) {
    desktop->CloseWindow(WALLPAPER);
    UntilRest();
    desktop->SetAlpha(TEXT, 0.5F);
    Tick();
    KeepSecretsOut();
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(CountReddish(), 0);
    EXPECT_EQ(At(110, 70).rgb & 0xFF0000, 0u);
    EXPECT_NE(At(110, 70), Rgb(BLACK)) << "a half of the text";
}

TEST_F(MixBackEnd, DrawsEachRectangleOfTheOverlapInItsOrder) {
    Open(20, SECRETS, Rect(10, 5, 30, 30), RED);
    KeepSecretsOut();
    const CTraceLog trace;
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(
        DrawLines(trace),
        (Lines{DrawLine({10, 5, 40, 35}, {0, 0, 65, 60}, "{w=65 h=60}", Rect(0, 60, 65, 60)),
               DrawLine({100, 60, 160, 100}, {75, 35, 185, 120}, "{w=110 h=85}", Rect(75, 0, 110, 85))}));
    EXPECT_EQ(CountReddish(), 0);
}

TEST_F(MixBackEnd, DrawsTheShadowThatReachesIntoTheMargin) {
    desktop->SetShadow(TEXT, {5, 5, 5, 5});
    KeepSecretsOut();
    const CTraceLog trace;
    EXPECT_EQ(Show(), OK);
    const TVLRect item{100, 60, 160, 100};
    EXPECT_EQ(DrawLines(trace),
              Lines{DrawLine(item, {75, 35, 185, 120}, "{w=110 h=85}", Rect(75, 0, 110, 85))});
    EXPECT_EQ(CountReddish(), 0);
}

// ---- The margin for shadows

TEST_F(MixBackEnd, GivesNoMarginToWhatIsNotWiderThanAShadow) {
    Hide(60, 45, 25, 30);
    const CTraceLog trace;
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(DrawLines(trace),
              Lines{DrawLine({60, 45, 85, 75}, {60, 45, 85, 75}, "{w=25 h=30}", Rect(60, 45, 25, 30))});
    EXPECT_EQ(Count(green), TEXT_PIXELS);
}

TEST_F(MixBackEnd, GivesNoMarginToWhatIsNotHigherThanAShadow) {
    Hide(60, 45, 30, 25);
    const CTraceLog trace;
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(DrawLines(trace),
              Lines{DrawLine({60, 45, 90, 70}, {60, 45, 90, 70}, "{w=30 h=25}", Rect(60, 50, 30, 25))});
}

TEST_F(MixBackEnd, GivesAMarginToWhatIsAPointLargerThanAShadow) {
    Hide(60, 45, 26, 26);
    const CTraceLog trace;
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(DrawLines(trace),
              Lines{DrawLine({60, 45, 86, 71}, {35, 20, 111, 96}, "{w=76 h=76}", Rect(35, 24, 76, 76))});
    EXPECT_EQ(Count(green), TEXT_PIXELS);
    EXPECT_EQ(Count(BLUE), ALL_PIXELS - TEXT_PIXELS);
}

TEST_F(MixBackEnd, CutsTheMarginAtTheEdgesOfTheDisplay) {
    Hide(160, 80, 100, 100);
    const CTraceLog trace;
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(DrawLines(trace),
              Lines{DrawLine({160, 80, 200, 120}, {135, 55, 200, 120}, "{w=65 h=65}", Rect(135, 0, 65, 65))});
}

TEST_F(MixBackEnd, DoublesTheMarginOnceItHasBeenGivenAFineDisplay) {
    Hide(60, 45, 26, 26);
    const auto extended = [this] {
        const CTraceLog trace;
        EXPECT_EQ(Show(), OK);
        const Lines lines = DrawLines(trace);
        return lines.size() == 1 ? lines.front() : std::string();
    };
    EXPECT_NE(extended().find(ShareUtil::TVLRectToString({35, 20, 111, 96})), std::string::npos);
    EXPECT_TRUE(backEnd->setCaptureDisplay(SIDE));
    EXPECT_TRUE(backEnd->setCaptureDisplay(MAIN));
    AwaitSamples();
    Pass();
    Drain();
    EXPECT_NE(extended().find(ShareUtil::TVLRectToString({35, 20, 111, 96})), std::string::npos)
        << "that of the display it has now";

    context->ClearSharedDisplay();
    context->AddSharedDisplay(SIDE);
    desktop->SetFrame(SECRET, Rect(220, 5, 50, 52));
    EXPECT_TRUE(backEnd->setCaptureDisplay(SIDE));
    AwaitSamples();
    UntilRest();
    Drain();
    const CTraceLog trace;
    Paint(SIDE_WALLPAPER, 0x008081);
    Tick();
    EXPECT_EQ(Pass(), OK);
    const TVLRect item{220, 10, 270, 57};
    EXPECT_EQ(DrawLines(trace), Lines{DrawLine(item, item, "{w=100 h=94}", Rect(40, 6, 100, 94))})
        << "50 points wide, which isn't wider than 50";
    EXPECT_EQ(Count(0x008081), 200 * 100);
}

// ---- Where it draws

TEST_F(MixBackEnd, DrawsAtTheScaleOfTheFrameAndFromItsBottom) {
    Hide(60, 44, 20, 20);
    backEnd->setMaxSize({100, 60});
    Tick();
    while (Show() == OK && SizeOf(*frame.Get()) != TVLSize{100, 60}) {
    }
    const CTraceLog trace;
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(DrawLines(trace),
              Lines{DrawLine({60, 44, 80, 64}, {60, 44, 80, 64}, "{w=20 h=20}", Rect(30, 28, 10, 10))});
    EXPECT_EQ(CountReddish(), 0);
    ExpectFilled({25, 20, 60, 40}, green);
}

// ---- The pointer

TEST_F(MixBackEnd, DrawsThePointerLastAndTellsOfItAFrameLater) {
    KeepSecretsOut();
    EXPECT_EQ(backEnd->pointerCaptured(), 0);
    ShowPointerAt({110, 70}); // over what is drawn again
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(Count(WHITE), 4 * 4);
    EXPECT_EQ(At(110, 70), Rgb(WHITE));
    EXPECT_EQ(Count(green), TEXT_PIXELS - 4 * 4);
    EXPECT_FALSE(Meta().bPointerCaptured) << "so it was a pass before";
    EXPECT_EQ(backEnd->pointerCaptured(), 1);
    EXPECT_EQ(Show(), OK);
    EXPECT_TRUE(Meta().bPointerCaptured);
    desktop->SetCursor(std::nullopt);
    EXPECT_EQ(Show(), OK);
    EXPECT_TRUE(Meta().bPointerCaptured);
    EXPECT_EQ(backEnd->pointerCaptured(), 0);
    EXPECT_EQ(Count(WHITE), 0);
}

TEST_F(MixBackEnd, DrawsNoPointerThatNobodyWants) {
    ShowPointerAt({20, 10});
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(backEnd->pointerCaptured(), 1);
    settings->m_nShareConfigFlags = SHARE_CONFIG_FLAG_NO_POINTER;
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(Count(WHITE), 0) << "nor is it in the session's picture";
    EXPECT_EQ(backEnd->pointerCaptured(), 1) << "which stays as it was";
}

TEST_F(MixBackEnd, MeasuresThePointerFromWhereTheDisplayWasWhenItWasAskedFor) {
    ShowPointerAt({220, 20});
    context->ClearSharedDisplay();
    context->AddSharedDisplay(SIDE);
    ASSERT_FLOAT_EQ(settings->GetCurrentScale(), 2.0F);
    EXPECT_TRUE(backEnd->setCaptureDisplay(SIDE));
    AwaitSamples();
    UntilRest();
    EXPECT_EQ(Pass(), OK);
    EXPECT_EQ(Count(WHITE), 0) << "440 pixels right of the frame's left edge";
    EXPECT_EQ(backEnd->getCaptureRect(), Rect(200, 10, 100, 50));
    Paint(SIDE_WALLPAPER, BLUE);
    Tick();
    EXPECT_EQ(Pass(), OK);
    EXPECT_EQ(Count(WHITE), 8 * 8);
    EXPECT_EQ(At(40, 20), Rgb(WHITE));
    EXPECT_EQ(At(39, 20), Rgb(BLUE));
}

// ---- Traces

TEST_F(MixBackEnd, TracesTheTimeOfEachStep) {
    KeepSecretsOut();
    EXPECT_EQ(Show(), OK);
    ShowPointerAt({20, 10});
    green ^= 1;
    Paint(TEXT, green);
    Tick();
    const CTraceLog trace;
    EXPECT_EQ(Pass(), OK);
    Lines expected;
    for (const char* const step :
         {"UpdateShareCapturerContext usageTime=0", "captureToIShareFrame usageTime=0",
          "fillbackground usageTime=0", "CGBitmapContextCreate usageTime=0", "GetRects usageTime=0",
          "captureScreenRect usageTime=0 WindowsCount=3",
          "CGContextDrawImage rcItem=", "CGContextDrawImage usageTime=0",
          "CaptureCursorToCGContext usageTime=0", "captureToIShareFrame total usageTime=0"})
        expected.push_back(Detail(std::string("ShareCapturerAVFoundationCGSMix.") + step));
    Lines lines = trace.LinesContaining("ShareCapturerAVFoundationCGSMix.");
    for (std::string& line : lines) {
        if (const std::size_t rest = line.find("rcItem="); rest != std::string::npos)
            line.resize(rest + 7);
    }
    EXPECT_EQ(lines, expected);
}

TEST_F(MixBackEnd, TracesOnlyTheFirstStepsOfAPassWithoutAPicture) {
    const CTraceLog trace;
    EXPECT_EQ(Pass(), NO_DATA);
    EXPECT_EQ(trace.LinesContaining("ShareCapturerAVFoundationCGSMix."),
              (Lines{Detail("ShareCapturerAVFoundationCGSMix.UpdateShareCapturerContext usageTime=0"),
                     Detail("ShareCapturerAVFoundationCGSMix.captureToIShareFrame usageTime=0")}));
}
