// SPDX-License-Identifier: Apache-2.0
#include "src/mac/avfoundation/share_capturer_mac_avfoundation.h"

#include "src/share_util.h"
#include "tests/src/mac/avfoundation/session_bench.h"

// The session's picture with flat colours over it. What it has in common with the mix is in
// share_capturer_session_test.cpp.

using namespace platform;

namespace {

class FlatBackEnd : public SessionBench {
protected:
    FlatBackEnd() : SessionBench(FLAT_BACK_END) {}

    /// Every pixel of a rectangle in frame coordinates.
    void ExpectFilled(const TVLRect& rect, std::uint32_t rgb) {
        EXPECT_EQ(CountIn(rect, rgb), (rect.right - rect.left) * (rect.bottom - rect.top));
    }
};

/// Finds what the test wants, on no display.
class CFoundContext final : public ShareCapturerContextMac {
public:
    int UpdateShareCapturerContext() override { return 0; }
    void Find(const TVLRect& overlap) { m_rgnOverlap.AddRect(overlap); }
};

} // namespace

// ---- Its life

TEST_F(FlatBackEnd, TracesItsBeginningAndItsEnd) {
    const CTraceLog trace;
    {
        ShareCapturerAVFoundation other;
        EXPECT_TRUE(other.init(context));
        other.initCapturerByData(nullptr, 0);
        EXPECT_TRUE(other.setCaptureDisplay(SIDE));
    }
    EXPECT_EQ(trace.LinesContaining("[ShareCapturerAVFoundation"),
              (Lines{Info("[ShareCapturerAVFoundation::initCapturer]"),
                     Info("[ShareCapturerAVFoundation::initCapturerByData]"),
                     Info("[ShareCapturerAVFoundation::setCaptureDisplay] 2"),
                     Info("[ShareCapturerAVFoundation::dealloc]")}));
}

TEST_F(FlatBackEnd, TracesThatItsSessionDidNotStart) {
    script->Fail(Operation::StartRunning);
    const CTraceLog trace;
    ShareCapturerAVFoundation other;
    EXPECT_TRUE(other.init(context));
    EXPECT_EQ(trace.LinesContaining("[ShareCapturerAVFoundation"),
              (Lines{Info("[ShareCapturerAVFoundation::initCapturer]"),
                     Info("[ShareCapturerAVFoundation::initCapturer failed with ] -1")}));
}

TEST_F(FlatBackEnd, HasTheDisplayThatItsSessionRefused) {
    const CTraceLog trace;
    EXPECT_FALSE(backEnd->setCaptureDisplay(77));
    const Lines lines = trace.LinesContaining("[ShareCapturerAVFoundation");
    ASSERT_EQ(lines.size(), 2u);
    EXPECT_EQ(lines[0], Info("[ShareCapturerAVFoundation::setCaptureDisplay] 77"));
    EXPECT_TRUE(IsLineAt(lines[1], Error("[ShareCapturerAVFoundation::setCaptureDisplay ] 77 failed with -1"),
                         "src/mac/avfoundation/share_capturer_mac_avfoundation"));
    EXPECT_EQ(backEnd->getCaptureDisplay(), 77u);
    EXPECT_TRUE(backEnd->setCaptureDisplay(MAIN));
    AwaitSamples();
    EXPECT_EQ(Pass(), OK);
}

TEST_F(FlatBackEnd, RefusesADisplayOnceWhenStoppingRaises) {
    script->Do(Operation::StopRunning, [] { throw NSException("name", "reason"); });
    EXPECT_FALSE(backEnd->setCaptureDisplay(SIDE));
    EXPECT_EQ(backEnd->getCaptureDisplay(), SIDE);
}

// ---- Meta information

TEST_F(FlatBackEnd, StampsTheFrameOfAPassWithoutAPictureToo) {
    EXPECT_EQ(Show(), OK);
    IShareFrame::MetaInfo other{};
    other.rectCapture = {1, 2, 3, 4};
    frame.Get()->SetMetaInfo(other);
    clock->Advance(ms(77));
    EXPECT_EQ(Pass(), NO_DATA);
    EXPECT_EQ(Meta().rectCapture, (TVLRect{0, 0, 200, 120}));
    EXPECT_TRUE(Meta().bPointerCaptured);
    EXPECT_EQ(frame.Get()->GetTimestamp(), ShareUtil::GetCaptureFrameTimeStamp());
    EXPECT_EQ(Count(RED), SECRET_PIXELS) << "the picture is as it was";

    script->Fail(Operation::LockBaseAddress);
    frame.Get()->SetMetaInfo(other);
    EXPECT_EQ(Show(), FAILED);
    EXPECT_EQ(Meta().rectCapture, (TVLRect{0, 0, 200, 120}));

    frame.Get()->SetMetaInfo(other);
    desktop->MoveWindow(WALLPAPER, {10, 0});
    EXPECT_EQ(Pass(), DRAGGING);
    EXPECT_EQ(Meta().rectCapture, other.rectCapture) << "not of one that was held back";
}

// ---- The pointer

TEST_F(FlatBackEnd, HasThePointerInTheSessionsPicture) {
    desktop->SetCursor(SquareCursor(WHITE));
    desktop->SetPointer(CGPoint{20, 10});
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(Count(WHITE), 4 * 4);
    EXPECT_EQ(At(20, 10), Rgb(WHITE));
    EXPECT_EQ(backEnd->pointerCaptured(), 1);
    EXPECT_TRUE(Meta().bPointerCaptured);
}

TEST_F(FlatBackEnd, CountsThePointerAsCapturedAlsoWhenNobodyWantsIt) {
    desktop->SetCursor(SquareCursor(WHITE));
    desktop->SetPointer(CGPoint{20, 10});
    settings->m_nShareConfigFlags = SHARE_CONFIG_FLAG_NO_POINTER;
    ShareCapturerAVFoundation other;
    EXPECT_EQ(other.pointerCaptured(), 1);
    EXPECT_TRUE(other.init(context));
    AwaitSamples();
    EXPECT_EQ(other.captureToIShareFrame(frame.Get()), OK);
    EXPECT_EQ(Count(WHITE), 0);
    EXPECT_TRUE(Meta().bPointerCaptured);
    EXPECT_EQ(other.pointerCaptured(), 1);
}

TEST_F(FlatBackEnd, HidesThePointerThatIsOnSomethingHidden) {
    KeepSecretsOut();
    desktop->SetCursor(SquareCursor(WHITE));
    desktop->SetPointer(CGPoint{120, 70});
    Tick();
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(Count(WHITE), 0);
}

// ---- What is painted over

TEST_F(FlatBackEnd, ShowsADesktopThatNothingIsKeptOutOfAsItIs) {
    EXPECT_EQ(Show(), OK);
    ExpectFilled({100, 60, 160, 100}, RED);
    ExpectFilled({50, 40, 130, 60}, green);
    ExpectFilled({50, 60, 100, 80}, green);
    EXPECT_EQ(Count(BLUE), ALL_PIXELS - SECRET_PIXELS - TEXT_PIXELS + TEXT_UNDER_SECRET);
}

TEST_F(FlatBackEnd, FillsTheOverlapOfADesktopAndNothingElse) {
    KeepSecretsOut();
    EXPECT_EQ(Show(), OK);
    ExpectFilled({100, 60, 160, 100}, FILL);
    EXPECT_EQ(Count(FILL), SECRET_PIXELS);
    EXPECT_EQ(Count(green), TEXT_PIXELS - TEXT_UNDER_SECRET);
    EXPECT_EQ(Count(BLUE), ALL_PIXELS - SECRET_PIXELS - TEXT_PIXELS + TEXT_UNDER_SECRET);
}

TEST_F(FlatBackEnd, FillsOverlapAndBackgroundOfAnApplicationInTheirColours) {
    settings->m_nOverlapFillColor = 0x001122;
    settings->m_nAppShareBackgroundColor = 0x003344;
    ShareEditor();
    EXPECT_EQ(Show(), OK);
    ExpectFilled({100, 60, 130, 80}, 0x001122);
    EXPECT_EQ(Count(0x001122), TEXT_UNDER_SECRET);
    EXPECT_EQ(Count(green), TEXT_PIXELS - TEXT_UNDER_SECRET);
    EXPECT_EQ(Count(0x003344), ALL_PIXELS - TEXT_PIXELS);
}

TEST_F(FlatBackEnd, FillsNoBackgroundOnADesktop) {
    settings->m_nAppShareBackgroundColor = 0x003344;
    KeepSecretsOut();
    desktop->CloseWindow(WALLPAPER);
    UntilRest();
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(Count(0x003344), 0);
}

TEST_F(FlatBackEnd, FillsOnlyTheBackgroundWhenTheApplicationHasNoWindow) {
    ShareEditor();
    desktop->SetOnScreen(TEXT, false);
    Tick();
    UntilRest();
    EXPECT_EQ(Pass(), OK);
    EXPECT_EQ(Count(FILL), ALL_PIXELS);
}

TEST_F(FlatBackEnd, FindsItsPixelsByTheWidthOfTheFrameAndCutsEachEdge) {
    desktop->SetFrame(SECRET, Rect(101, 61, 33, 21)); // to 134 and 82
    Tick();
    KeepSecretsOut();
    backEnd->setMaxSize({100, 60});
    Tick();
    while (Show() == OK && SizeOf(*frame.Get()) != TVLSize{100, 60}) {
    }
    ExpectFilled({50, 30, 67, 41}, FILL);
    EXPECT_EQ(Count(FILL), 17 * 11) << "50.5 to 67, 30.5 to 41";
}

TEST_F(FlatBackEnd, FindsItsPixelsOnAFineDisplayThatLiesElsewhere) {
    Open(20, SECRETS, Rect(230, 20, 15, 10), RED);
    context->ClearSharedDisplay();
    context->AddSharedDisplay(SIDE);
    EXPECT_TRUE(backEnd->setCaptureDisplay(SIDE));
    AwaitSamples();
    KeepSecretsOut();
    Paint(SIDE_WALLPAPER, 0x008081);
    Tick();
    while (Pass() == OK) {
    }
    EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{200, 100}));
    ExpectFilled({60, 20, 90, 40}, FILL);
    EXPECT_EQ(Count(FILL), 30 * 20);
    EXPECT_EQ(Count(0x008081), 200 * 100 - 30 * 20);
}

TEST_F(FlatBackEnd, ClipsWhatIsHiddenAtTheEdgeOfTheDisplay) {
    desktop->SetFrame(SECRET, Rect(180, 100, 60, 40));
    Tick();
    KeepSecretsOut();
    EXPECT_EQ(Show(), OK);
    ExpectFilled({180, 100, 200, 120}, FILL);
    EXPECT_EQ(Count(FILL), 20 * 20);
}

TEST_F(FlatBackEnd, TakesTheScaleOfItsSessionWhenNoDisplayTellsOne) {
    const auto found = std::make_shared<CFoundContext>();
    found->Find({100, 60, 160, 100});
    ShareCapturerAVFoundation other;
    ASSERT_TRUE(other.init(found));
    AwaitSamples();
    EXPECT_EQ(other.captureToIShareFrame(frame.Get()), OK);
    ExpectFilled({100, 60, 160, 100}, FILL);
    other.setMaxSize({100, 60});
    Tick();
    EXPECT_EQ(other.captureToIShareFrame(frame.Get()), OK);
    EXPECT_EQ(Meta().rectCapture, (TVLRect{0, 0, 0, 0}));
    ExpectFilled({50, 30, 80, 50}, FILL);
    EXPECT_EQ(Count(FILL), 30 * 20);
}

TEST_F(FlatBackEnd, DoesNotAskForPicturesOfWindows) {
    KeepSecretsOut();
    const unsigned before = desktop->CallsOf(DesktopOperation::TakeWindowPicture);
    for (int i = 0; i < 5; ++i)
        EXPECT_EQ(Show(), OK);
    EXPECT_EQ(desktop->CallsOf(DesktopOperation::TakeWindowPicture), before);
}

// ---- Traces

TEST_F(FlatBackEnd, TracesItsTimesWhenThatIsWanted) {
    const CTraceLog trace;
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(trace.CountContaining("[Performance]"), 0u);
    settings->m_nShareConfigFlags = SHARE_CONFIG_FLAG_PERFORMANCE_TRACE;
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(Pass(), NO_DATA);
    EXPECT_EQ(trace.LinesContaining("[Performance]ShareCapturer"),
              Lines{Info("[Performance]ShareCapturerAVFoundation.captureToIShareFrame usageTime=0")});
}
