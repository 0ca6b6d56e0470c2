// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_capturer_cgs_gcd.h"

#include "platform/app_kit.h"
#include "src/share_util.h"
#include "tests/src/mac/queued_backend_bench.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

using namespace platform;

namespace {

using Lines = std::vector<std::string>;

CGRect Rect(float x, float y, float width, float height) {
    return {{x, y}, {width, height}};
}

class QueuedDisplays : public QueuedBackEnd {};

} // namespace

// ---- What every back-end answers

TEST_F(QueuedBackEnd, IsReadyOnTheMainDisplayAfterInit) {
    EXPECT_EQ(backEnd->getCaptureDisplay(), MAIN);
    EXPECT_EQ(backEnd->getCaptureRect(), Rect(0, 0, 200, 120));
    EXPECT_EQ(backEnd->getFrameSize(), (TVLSize{200, 120}));
    EXPECT_FLOAT_EQ(settings->GetCurrentScale(), 1.0F);
    EXPECT_TRUE(context->IsAppUnShared(ShareUtil::GetCurrentPID())) << "our own windows are kept out";
}

TEST_F(QueuedBackEnd, TracesItsBeginning) {
    const CTraceLog trace;
    const auto other = std::make_shared<ShareCapturerCGSGCD>();
    EXPECT_TRUE(other->init());
    EXPECT_EQ(trace.LinesContaining("[ShareCapturerCGSGCD"),
              (Lines{Info("[ShareCapturerCGSGCD::init] without context"),
                     Info("[ShareCapturerCGSGCD::initBmpContext] displayid=1 left = 0 top = 0 width = 200 "
                          "height = 120")}));
}

TEST_F(QueuedBackEnd, AnswersWhatEveryBackEndAnswers) {
    EXPECT_EQ(backEnd->capture(), nullptr);
    EXPECT_EQ(backEnd->getCaptureFormat(), 1);
    EXPECT_EQ(backEnd->setCaptureThreadCount(3), static_cast<unsigned>(-5));
    EXPECT_EQ(backEnd->setFPS(30), 0);
    EXPECT_EQ(backEnd->getSharedAppCount(), 0u);
    EXPECT_FALSE(backEnd->IsWindowAreaBaseContentSupport());
    ShareApp();
    EXPECT_EQ(backEnd->getSharedAppCount(), 1u);
    EXPECT_TRUE(backEnd->IsWindowAreaBaseContentSupport());
}

TEST_F(QueuedBackEnd, CapturesNothingBeforeInitAndIntoNoFrame) {
    const auto unfit = std::make_shared<ShareCapturerCGSGCD>();
    EXPECT_EQ(unfit->captureToIShareFrame(frame.Get()), FAILED);
    EXPECT_EQ(unfit->pointerCaptured(), 0);
    EXPECT_EQ(unfit->getSharedAppCount(), 0u);
    EXPECT_FALSE(unfit->IsWindowAreaBaseContentSupport());
    EXPECT_EQ(backEnd->captureToIShareFrame(nullptr), FAILED);
    EXPECT_EQ(OnTheirWay(), 0) << "and begins none";
    EXPECT_EQ(Pictures(), 0u);
}

// ---- The pipeline

TEST_F(QueuedBackEnd, HasNothingAtFirstAndBeginsOneCapture) {
    EXPECT_EQ(Tick(), NOT_READY);
    ASSERT_TRUE(Settles());
    EXPECT_EQ(Pictures(), 1u);
    EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{0, 0})) << "the frame is as it was";
}

TEST_F(QueuedBackEnd, HandsOverWhatWasBegunATickBefore) {
    clock->Advance(ms(1234));
    EXPECT_EQ(Tick(), NOT_READY);
    ASSERT_TRUE(Settles());
    const unsigned stamp = ShareUtil::GetCaptureFrameTimeStamp();
    clock->Advance(ms(33));
    Paint(0x000001);
    EXPECT_EQ(Tick(), OK);
    EXPECT_EQ(CountOf(*frame.Get(), GREEN), 80 * 40);
    EXPECT_EQ(frame.Get()->GetTimestamp(), stamp);
    EXPECT_EQ(frame.Get()->GetMetaInfo().rectCapture, (TVLRect{0, 0, 200, 120}));
    EXPECT_TRUE(frame.Get()->GetMetaInfo().bPointerCaptured) << "it is elsewhere";
    ASSERT_TRUE(Settles());
    EXPECT_EQ(Tick(), OK);
    EXPECT_EQ(Shown(), 1u);
}

TEST_F(QueuedBackEnd, ChangesBuffersWithTheFrameThatItIsGiven) {
    Tick();
    ASSERT_TRUE(Settles());
    frame.Get()->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    frame.Get()->SetFrameSize(200, 120);
    const unsigned char* const before = frame.Get()->GetFrameData();
    EXPECT_EQ(Tick(), OK);
    EXPECT_NE(frame.Get()->GetFrameData(), before) << "nothing was copied";
}

TEST_F(QueuedBackEnd, FillsMemoryThatIsNotTheFramesOwn) {
    std::vector<unsigned char> memory(200 * 120 * 4);
    EXPECT_EQ(frame.Get()->SetExternalBuf(memory.data(), static_cast<int>(memory.size())), 0);
    Tick();
    ASSERT_TRUE(Settles());
    EXPECT_EQ(Tick(), OK);
    EXPECT_EQ(frame.Get()->GetFrameData(), memory.data());
    EXPECT_EQ(CountOf(*frame.Get(), GREEN), 80 * 40);
    EXPECT_EQ(frame.Get()->GetMetaInfo().rectCapture, (TVLRect{0, 0, 200, 120}));
    EXPECT_TRUE(frame.Get()->GetMetaInfo().bPointerCaptured);
}

TEST_F(QueuedBackEnd, TellsOfThePointerWhatTheCaptureDidThatEndedLast) {
    EXPECT_EQ(backEnd->pointerCaptured(), 0);
    Tick();
    ASSERT_TRUE(Settles());
    EXPECT_EQ(backEnd->pointerCaptured(), 1) << "it is elsewhere";
    desktop->SetPointer(CGPoint{10, 10});
    Tick();
    ASSERT_TRUE(Settles());
    EXPECT_EQ(backEnd->pointerCaptured(), 0) << "there is no cursor";
    desktop->SetCursor(SquareCursor(0x0000FF));
    Tick();
    ASSERT_TRUE(Settles());
    EXPECT_EQ(backEnd->pointerCaptured(), 1) << "it is drawn";
}

TEST_F(QueuedBackEnd, HasFiveSlowCapturesOnTheirWayAndNoSixth) {
    for (int i = 0; i < 5; ++i) {
        EXPECT_EQ(OnTheirWay(), i);
        BeginPicture(300);
    }
    EXPECT_EQ(Tick(), NOT_READY);
    EXPECT_EQ(Tick(), NOT_READY);
    EXPECT_EQ(OnTheirWay(), 5);
    EXPECT_EQ(Pictures(), 5u);
    Advance(300);
    ASSERT_TRUE(Settles());
    for (int i = 0; i < 5; ++i)
        EXPECT_EQ(Tick(), OK) << "all of them began at the same time";
}

TEST_F(QueuedBackEnd, UsesTheFrameThatIsFetchedOfAFullQueueForTheNextCapture) {
    FinishPictures(5);
    Paint(6);
    EXPECT_EQ(Tick(), OK);
    EXPECT_EQ(Shown(), 1u);
    ASSERT_TRUE(Settles());
    EXPECT_EQ(Pictures(), 6u);
    for (std::uint32_t picture = 2; picture <= 6; ++picture) {
        EXPECT_EQ(Tick(), OK);
        EXPECT_EQ(Shown(), picture);
        ASSERT_TRUE(Settles());
    }
}

TEST_F(QueuedBackEnd, GivesTheOldestPictureUpForANewOneWithoutATrace) {
    for (unsigned picture = 1; picture <= 6; ++picture)
        desktop->DoAt(Operation::TakeWindowPicture, picture, [this, picture] { Paint(picture); });
    CClog clog;
    for (int i = 0; i < 6; ++i)
        EXPECT_EQ(Tick(), NOT_READY) << "every frame is still free";
    const CTraceLog trace(CM_TRACE_INFO);
    clog.OpenOne(); // five captures fill the queue before the sixth begins
    ASSERT_TRUE(Settles());
    EXPECT_EQ(Pictures(), 6u);
    EXPECT_EQ(trace.Lines(), Lines{});
    clog.Open();
    for (std::uint32_t picture = 2; picture <= 6; ++picture) {
        EXPECT_EQ(Tick(), OK);
        EXPECT_EQ(Shown(), picture);
        ASSERT_TRUE(Settles());
    }
}

TEST_F(QueuedBackEnd, EndsACaptureThatFindsNoFrame) {
    CClog clog;
    for (int i = 0; i < 7; ++i)
        EXPECT_EQ(Tick(), NOT_READY);
    desktop->DelayAlways(Operation::TakeWindowPicture, ms(300));
    clog.Open();
    ASSERT_TRUE(Settles(5)) << "two of the seven have ended";
    ASSERT_TRUE(Begins(5));
    EXPECT_EQ(Pictures(), 5u);
    desktop->Heal(Operation::TakeWindowPicture);
    Advance(300);
    ASSERT_TRUE(Settles());
    EXPECT_EQ(Tick(), OK);
}

// ---- Order and failures

TEST_F(QueuedBackEnd, DropsAPictureThatBeganBeforeOneThatIsThere) {
    BeginPicture(500);
    Advance(100);
    BeginPicture(100);
    Advance(100);
    ASSERT_TRUE(Settles(1));
    const CTraceLog trace;
    Paint(1);
    Advance(300);
    ASSERT_TRUE(Settles());
    EXPECT_EQ(trace.LinesContaining("disorder"),
              Lines{Info("pushCapturedFrame, disorder frame, disorder_ms=100, capture_ms=500, "
                         "last_capture_ms=100")});
    EXPECT_EQ(Tick(), OK);
    EXPECT_EQ(Shown(), GREEN);
    ASSERT_TRUE(Settles());
    EXPECT_EQ(Tick(), OK);
    EXPECT_EQ(Shown(), 1u);
}

TEST_F(QueuedBackEnd, IsNotPutOutOfOrderByACaptureThatFails) {
    BeginPicture(500);
    Advance(100);
    desktop->FailNext(Operation::TakeWindowPicture);
    BeginPicture(100);
    Advance(100);
    ASSERT_TRUE(Settles(1));
    const CTraceLog trace;
    Advance(300);
    ASSERT_TRUE(Settles());
    EXPECT_EQ(trace.LinesContaining("disorder"), Lines{});
    EXPECT_EQ(Tick(), OK) << "the one that began first";
    EXPECT_EQ(Shown(), GREEN);
}

TEST_F(QueuedBackEnd, LosesNoFrameByFailures) {
    desktop->FailAlways(Operation::TakeWindowPicture);
    for (unsigned i = 1; i <= 12; ++i) {
        EXPECT_EQ(Tick(), NOT_READY);
        ASSERT_TRUE(Settles());
        EXPECT_EQ(Pictures(), i);
    }
    desktop->Heal(Operation::TakeWindowPicture);
    FinishPictures(5);
    for (std::uint32_t picture = 1; picture <= 5; ++picture) {
        EXPECT_EQ(Tick(), OK);
        EXPECT_EQ(Shown(), picture);
    }
}

TEST_F(QueuedBackEnd, CapturesOnTheCallersThreadWhereNoOtherCanBeStarted) {
    {
        const CNoNewThreadsScope noThreads;
        EXPECT_EQ(Tick(), NOT_READY) << "the capture comes after the look";
        EXPECT_EQ(OnTheirWay(), 0);
        EXPECT_EQ(Tick(), OK);
        EXPECT_EQ(CountOf(*frame.Get(), GREEN), 80 * 40);
    }
    EXPECT_EQ(Tick(), OK);
}

// ---- Drags

TEST_F(QueuedBackEnd, LetsPicturesFromBeforeADragDrainAway) {
    ShareApp();
    FinishPictures(5);
    desktop->MoveWindow(EDITOR_WINDOW, {52, 41});
    EXPECT_EQ(Tick(), DRAGGING);
    EXPECT_EQ(Tick(), DRAGGING);
    EXPECT_EQ(OnTheirWay(), 0) << "nothing is begun";
    EXPECT_EQ(Pictures(), 5u);
    Advance(501);
    Paint(6);
    for (std::uint32_t picture = 3; picture <= 6; ++picture) {
        EXPECT_EQ(Tick(), OK);
        EXPECT_EQ(Shown(), picture) << "each tick of the drag took one";
        ASSERT_TRUE(Settles());
    }
}

TEST_F(QueuedBackEnd, HasNothingLeftOfALongDrag) {
    ShareApp();
    FinishPictures(2);
    desktop->MoveWindow(EDITOR_WINDOW, {52, 41});
    for (int i = 0; i < 4; ++i)
        EXPECT_EQ(Tick(), DRAGGING);
    Advance(501);
    EXPECT_EQ(Tick(), NOT_READY);
    ASSERT_TRUE(Settles());
    EXPECT_EQ(Tick(), OK);
    EXPECT_EQ(PixelAt(*frame.Get(), 50, 40), Rgb(0x9e9e)) << "it has moved";
}

TEST_F(QueuedBackEnd, NeverAsksWhetherWindowsMoveOfADesktop) {
    context->AddSharedDisplay(MAIN);
    for (int i = 0; i < 4; ++i) {
        EXPECT_EQ(Tick(), i == 0 ? NOT_READY : OK);
        ASSERT_TRUE(Settles());
        desktop->MoveWindow(EDITOR_WINDOW, {50 + static_cast<float>(i), 40});
    }
    std::vector<unsigned> walked;
    context->GetCapturedWindows(walked);
    EXPECT_EQ(walked, std::vector<unsigned>{}) << "nobody has walked";
}

TEST_F(QueuedBackEnd, GivesTheBackgroundOfAnApplicationWithoutWindows) {
    settings->m_nAppShareBackgroundColor = 0x102030;
    ShareApp();
    desktop->CloseWindow(EDITOR_WINDOW);
    EXPECT_EQ(Tick(), NOT_READY);
    ASSERT_TRUE(Settles());
    EXPECT_EQ(Tick(), OK);
    EXPECT_EQ(CountOf(*frame.Get(), 0x102030), 200 * 120);
}

TEST_F(QueuedBackEnd, SharesEverythingWithoutAContext) {
    const auto other = std::make_shared<ShareCapturerCGSGCD>();
    EXPECT_TRUE(other->init(std::shared_ptr<ShareCapturerContext>()));
    EXPECT_EQ(other->captureToIShareFrame(frame.Get()), NOT_READY);
    ASSERT_TRUE(Comes([&] { return other.use_count() == 1; }));
    EXPECT_EQ(other->captureToIShareFrame(frame.Get()), OK);
    EXPECT_EQ(CountOf(*frame.Get(), GREEN), 80 * 40);
    ASSERT_TRUE(Comes([&] { return other.use_count() == 1; }));
}

// ---- The display and its size

TEST_F(QueuedDisplays, AreFollowed) {
    const CTraceLog trace;
    EXPECT_TRUE(backEnd->setCaptureDisplay(SIDE));
    EXPECT_TRUE(backEnd->setCaptureDisplay(SIDE));
    EXPECT_EQ(trace.LinesContaining("CGSGCD"),
              Lines{Info("[ShareCapturerCGSGCD::initBmpContext] displayid=2 left = 200 top = 10 width = 100 "
                         "height = 50")});
    EXPECT_EQ(backEnd->getFrameSize(), (TVLSize{200, 100}));
    EXPECT_FLOAT_EQ(settings->GetCurrentScale(), 2.0F);
    Tick();
    ASSERT_TRUE(Settles());
    Tick();
    EXPECT_EQ(frame.Get()->GetMetaInfo().rectCapture, (TVLRect{200, 10, 300, 60}));
    EXPECT_TRUE(backEnd->setCaptureDisplay(SHARE_INVALID_DISPLAY));
    EXPECT_EQ(backEnd->getFrameSize(), (TVLSize{200, 100})) << "no display has no size";
}

TEST_F(QueuedDisplays, AreNotShownOnceAnotherIsCaptured) {
    FinishPictures(3);
    BeginPicture(300);
    backEnd->setCaptureDisplay(SIDE);
    Advance(300);
    ASSERT_TRUE(Settles());
    EXPECT_EQ(Tick(), NOT_READY) << "there are pictures, but of another display";
    ASSERT_TRUE(Settles());
    EXPECT_EQ(Tick(), OK);
    EXPECT_EQ(frame.Get()->GetMetaInfo().rectCapture, (TVLRect{200, 10, 300, 60}));
}

TEST_F(QueuedDisplays, AreNotShownFromBeforeTheyWereLeft) {
    FinishPictures(3);
    backEnd->setCaptureDisplay(SIDE);
    backEnd->setCaptureDisplay(MAIN);
    EXPECT_EQ(Tick(), NOT_READY);
    ASSERT_TRUE(Settles());
    EXPECT_EQ(Tick(), OK);
}

TEST_F(QueuedDisplays, MayBeToldAgainWithoutLossOfAPicture) {
    FinishPictures(1);
    backEnd->setCaptureDisplay(MAIN);
    EXPECT_EQ(Tick(), OK);
}

TEST_F(QueuedDisplays, AreCapturedAsLargeAsTheLimitAllowsWithATraceOfEachStep) {
    const CTraceLog trace;
    backEnd->setMaxSize({2880, 1800});
    EXPECT_EQ(trace.Lines(), Lines{}) << "the limit in force";
    backEnd->setMaxSize({100, 60});
    EXPECT_EQ(backEnd->getFrameSize(), (TVLSize{100, 60}));
    EXPECT_FLOAT_EQ(settings->GetCurrentScale(), 0.5F);
    backEnd->setMaxSize({100, 61});
    EXPECT_EQ(
        trace.Lines(),
        (Lines{Info("[ShareCapturerCGSGCD::setMaxSize],m_szMaxCapture:x=2880,y=1800,nMaxSize:x=100,y=60"),
               Info("[ShareCapturerCGSGCD::initBmpContext] displayid=1 left = 0 top = 0 width = 200 "
                    "height = 120"),
               Info("[ShareCapturerCGSGCD::setMaxSize],m_szMaxCapture:x=100,y=60,nMaxSize:x=100,y=61"),
               Info("[ShareCapturerCGSGCD::setMaxSize] no change")}));
    Tick();
    ASSERT_TRUE(Settles());
    EXPECT_EQ(Tick(), OK);
    EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{100, 60}));
}

TEST_F(QueuedDisplays, TellAChangeOfTheCapturedOneFromThatOfAnother) {
    const CTraceLog trace;
    EXPECT_EQ(backEnd->onDisplayPlugin(SIDE), 0);
    EXPECT_EQ(backEnd->onDisplayPlugout(SIDE), 0);
    EXPECT_EQ(backEnd->onScreenResolutionChanged(SIDE), 0);
    EXPECT_EQ(trace.Lines(), Lines{});
    EXPECT_EQ(backEnd->onDisplayPlugin(MAIN), 1);
    EXPECT_EQ(backEnd->onDisplayPlugout(MAIN), 1);
    EXPECT_EQ(backEnd->onScreenResolutionChanged(MAIN), 0);
    EXPECT_EQ(trace.Lines(),
              (Lines{Info("[ShareCapturerCGSGCD::onDisplayPlugin] m_nCapturedDisplayId is plugout"),
                     Info("[ShareCapturerCGSGCD::onDisplayPlugout] m_nCapturedDisplayId is plugout"),
                     Info("[ShareCapturerCGSGCD::onScreenResolutionChanged] no change")}));
    desktop->ResizeDisplay(MAIN, {160, 90});
    EXPECT_EQ(backEnd->onScreenResolutionChanged(MAIN), 1);
    EXPECT_EQ(backEnd->getFrameSize(), (TVLSize{160, 90}));
    EXPECT_EQ(backEnd->getCaptureRect(), Rect(0, 0, 160, 90));
}

// ---- Ends of applications

TEST_F(QueuedBackEnd, ForgetsASharedApplicationThatEnds) {
    ShareApp();
    CTally heard;
    NSWorkspace::sharedWorkspace()->notificationCenter()->addObserver(
        &heard, [&](const NSNotification&) { heard.Add(); }, NSWorkspaceDidTerminateApplicationNotification);
    desktop->EndApplication(EDITOR);
    EXPECT_TRUE(heard.Reaches(1));
    NSWorkspace::sharedWorkspace()->notificationCenter()->removeObserver(&heard);
    EXPECT_EQ(context->GetSharedAppCount(), 0);
}
