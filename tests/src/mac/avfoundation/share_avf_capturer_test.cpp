// SPDX-License-Identifier: Apache-2.0
#include "src/mac/avfoundation/share_avf_capturer.h"

#include "tests/src/mac/avfoundation/avf_capturer_rig.h"
#include "tests/support/call_on_thread.h"

/// The states of a session: not made, made, configured, running; and every way from one to another.

namespace {

using namespace platform;

class AVFSession : public CAVFCapturerRig {
protected:
    void RaiseAt(Operation operation, const char* text) {
        script->Do(operation, [text] { throw NSException("Name", text); });
    }
    void ThrowAt(Operation operation) {
        script->Do(operation, [] { throw std::runtime_error("another kind"); });
    }
    Lines LinesOf(const CTraceLog& trace) const {
        return WithoutSourcePlaces(trace.LinesContaining("[ShareAVFCapturer"));
    }
};

} // namespace

// ---- Not made, made

TEST_F(AVFSession, IsNotMadeAtFirst) {
    EXPECT_FALSE(capturer->isValid());
    EXPECT_FALSE(capturer->isRunning());
    EXPECT_EQ(capturer->getCaptureRect(), (CGRect{{0, 0}, {40, 30}})) << "of the main display";
    EXPECT_EQ(capturer->scaleFactor(), 1.0F);
    EXPECT_EQ(capturer->setFPS(-1), 35);
}

TEST_F(AVFSession, CanDoNothingWithoutASession) {
    EXPECT_EQ(capturer->startRun(), -1);
    EXPECT_EQ(capturer->stopRun(), 0);
    EXPECT_EQ(capturer->createVideoInputAndOutput(), -1);
    EXPECT_EQ(capturer->destroyVideoInputAndOutput(), 0);
    EXPECT_EQ(capturer->updateVideoFormat(), -2) << "no display is known";
    EXPECT_EQ(capturer->initDisplay(true), -1);
    EXPECT_EQ(capturer->updateVideoFormat(), -1) << "but now";
    EXPECT_EQ(capturer->setScale({20, 15}), NOTHING_TO_SCALE);
    capturer->beginAnew();
    EXPECT_EQ(Capture(), NO_DATA);
    EXPECT_EQ(Calls(Operation::ScreenInputInit), 0u);
    EXPECT_EQ(capturer.use_count(), 1);
}

TEST_F(AVFSession, NotesTheDisplayEvenWithoutASession) {
    EXPECT_EQ(capturer->setInputDisplay(SIDE), -1);
    EXPECT_EQ(capturer->getCaptureRect(), (CGRect{{40, 0}, {20, 20}}));
}

TEST_F(AVFSession, IsMadeOnce) {
    const CTraceLog trace;
    Init();
    EXPECT_TRUE(capturer->isValid());
    EXPECT_FALSE(capturer->isRunning());
    Init();
    EXPECT_EQ(Calls(Operation::SessionInit), 1u);
    EXPECT_EQ(LinesOf(trace), Lines{Info("[ShareAVFCapturer initShareAVFCapturer - new sessin created]")});
}

TEST_F(AVFSession, ShowsLaterThatItCouldNotBeMade) {
    script->Fail(Operation::SessionInit);
    EXPECT_TRUE(capturer->initShareAVFCapturer());
    EXPECT_FALSE(capturer->isValid());
    EXPECT_EQ(capturer->startRun(), -1);
    Start();
}

TEST_F(AVFSession, TellsOfItsEnd) {
    Init();
    const std::string session = Session();
    const std::string self = Self();
    const CTraceLog trace;
    capturer = nullptr;
    EXPECT_EQ(LinesOf(trace),
              Lines{Info("[ShareAVFCapturer dealloc] capture session = " + session + ", self = " + self)});
}

// ---- Made, configured

TEST_F(AVFSession, IsKeptByItsQueueWhileItIsConfigured) {
    Init();
    EXPECT_EQ(capturer->createVideoInputAndOutput(), 0);
    EXPECT_FALSE(capturer->isRunning());
    EXPECT_EQ(capturer.use_count(), 2);
    const CTraceLog trace;
    EXPECT_EQ(capturer->destroyVideoInputAndOutput(), 0);
    EXPECT_TRUE(Shares(1));
    EXPECT_EQ(LinesOf(trace), Lines{Info("[ShareAVFCapturer captureCleanup] self = " + Self())});
    EXPECT_EQ(capturer->updateVideoFormat(), -1) << "the output is gone";
    EXPECT_EQ(capturer->setScale({20, 15}), NOTHING_TO_SCALE) << "and so is the input";
}

TEST_F(AVFSession, IsConfiguredAnewWithTheOutputThatItHas) {
    Init();
    EXPECT_EQ(capturer->createVideoInputAndOutput(), 0);
    const CTraceLog trace;
    EXPECT_EQ(capturer->createVideoInputAndOutput(), 0);
    EXPECT_TRUE(trace.WaitUntilContains("captureCleanup"));
    EXPECT_TRUE(Shares(2)) << "by the new queue alone";
    EXPECT_EQ(Calls(Operation::VideoDataOutputInit), 1u);
    EXPECT_EQ(Calls(Operation::ScreenInputInit), 2u);
    EXPECT_TRUE(trace.Contains(Info("[ShareAVFCapturer initDisplay displayed changed]")));
    EXPECT_TRUE(trace.Contains(
        Info("[ShareAVFCapturer createVideoInputAndOutput] cannot add output, display_id = 1")));
    StartAndTake();
}

TEST_F(AVFSession, IsNotConfiguredForADisplayWithoutAnArea) {
    Init();
    ASSERT_TRUE(desktop->RemoveDisplay(MAIN));
    const CTraceLog trace;
    EXPECT_EQ(capturer->initDisplay(true), -1);
    EXPECT_EQ(capturer->createVideoInputAndOutput(), -1);
    EXPECT_EQ(capturer->startRun(), -1);
    const Lines lines = trace.LinesContaining("[ShareAVFCapturer");
    EXPECT_EQ(lines.size(), 3u);
    EXPECT_TRUE(AreAllAt(
        lines, Error("[ShareAVFCapturer initDisplay Failed] m_capture_width = 0, m_capture_height = 0"),
        FILE_OF_DISPLAY));
    EXPECT_EQ(Calls(Operation::ScreenInputInit), 0u);
    EXPECT_EQ(capturer.use_count(), 1);
}

TEST_F(AVFSession, IsNotConfiguredWithoutAnInput) {
    Init();
    script->Fail(Operation::ScreenInputInit, 1, 2);
    EXPECT_EQ(capturer->createVideoInputAndOutput(), -1);
    EXPECT_EQ(capturer->startRun(), -1);
    EXPECT_EQ(Calls(Operation::VideoDataOutputInit), 0u);
    EXPECT_EQ(Calls(Operation::StartRunning), 0u);
    StartAndTake();
}

TEST_F(AVFSession, IsNotConfiguredWithoutAnOutput) {
    Init();
    const std::string session = Session();
    script->Fail(Operation::VideoDataOutputInit, 1, 2);
    const CTraceLog trace;
    EXPECT_EQ(capturer->createVideoInputAndOutput(), -1);
    EXPECT_EQ(capturer->startRun(), -1);
    const Lines warnings = trace.LinesContaining("WARNING");
    EXPECT_EQ(warnings.size(), 2u);
    EXPECT_TRUE(AreAllAt(warnings,
                         Warning("[ShareAVFCapturer createVideoInputAndOutput] create output fail, capture "
                                 "session = " +
                                 session),
                         FILE_OF_LIFE));
    EXPECT_EQ(capturer.use_count(), 1);
    EXPECT_EQ(Calls(Operation::StartRunning), 0u);
    StartAndTake();
}

TEST_F(AVFSession, GoesOnWhenNothingCanBeAdded) {
    Init();
    script->Fail(Operation::CanAddInput);
    script->Fail(Operation::CanAddOutput);
    const CTraceLog trace;
    EXPECT_EQ(capturer->createVideoInputAndOutput(), 0);
    EXPECT_EQ(
        LinesOf(trace),
        (Lines{Info("[ShareAVFCapturer initDisplay screen input]"),
               Info("[ShareAVFCapturer createVideoInputAndOutput] cannot add display, display_id = 1"),
               Info("[ShareAVFCapturer initDisplay returned with ]0"),
               Info("[ShareAVFCapturer createVideoInputAndOutput] cannot add output, display_id = 1")}));
    EXPECT_EQ(capturer.use_count(), 2);
}

// ---- Running

TEST_F(AVFSession, StartsAndTellsHow) {
    Init();
    const std::string session = Session();
    const CTraceLog trace;
    EXPECT_EQ(capturer->startRun(), 0);
    EXPECT_TRUE(capturer->isRunning());
    EXPECT_EQ(
        LinesOf(trace),
        (Lines{Info("[ShareAVFCapturer initDisplay screen input]"),
               Info("[ShareAVFCapturer createVideoInputAndOutput] open display success, display_id = 1"),
               Info("[ShareAVFCapturer initDisplay returned with ]0"),
               Info("[ShareAVFCapturer updateVideoFormat]  width = 40, height = 30 ,self = " + Self()),
               Info("[ShareAVFCapturer didStartRunning] capture session has started running, capture "
                    "session = " +
                    session),
               Info("[ShareAVFCapturer startRun returned with ] 0")}));
}

TEST_F(AVFSession, IsNotStartedTwice) {
    StartAndTake();
    const CTraceLog trace;
    EXPECT_EQ(capturer->startRun(), 0);
    EXPECT_EQ(trace.Lines(), Lines{});
    EXPECT_EQ(Calls(Operation::StartRunning), 1u);
}

TEST_F(AVFSession, StopsAndLosesInputAndOutput) {
    StartAndTake();
    const std::string session = Session();
    const CTraceLog trace;
    EXPECT_EQ(capturer->stopRun(), 0);
    EXPECT_FALSE(capturer->isRunning());
    EXPECT_TRUE(Shares(1));
    EXPECT_EQ(LinesOf(trace),
              (Lines{Info("[ShareAVFCapturer didStopRunning] capture session has stopped running, capture "
                          "session = " +
                          session),
                     Info("[ShareAVFCapturer captureCleanup] self = " + Self())}));
    EXPECT_EQ(capturer->updateVideoFormat(), -1);
}

TEST_F(AVFSession, IsBuiltAnewByTheNextStart) {
    StartAndTake();
    EXPECT_EQ(capturer->stopRun(), 0);
    StartAndTake();
    EXPECT_EQ(Calls(Operation::ScreenInputInit), 2u);
    EXPECT_EQ(Calls(Operation::VideoDataOutputInit), 2u);
}

TEST_F(AVFSession, LeavesInputAndOutputAloneWhenItIsStoppedAlready) {
    Init();
    EXPECT_EQ(capturer->createVideoInputAndOutput(), 0);
    const CTraceLog trace;
    EXPECT_EQ(capturer->stopRun(), 0);
    EXPECT_EQ(trace.Lines(), Lines{Info("[ShareAVFCapturer stopRun] CatpureSession is already stopped")});
    EXPECT_EQ(capturer->updateVideoFormat(), 0) << "the output is there";
    EXPECT_EQ(capturer->setScale({20, 15}), OK) << "and the input";
    EXPECT_EQ(capturer.use_count(), 2);
}

// ---- A start that fails

TEST_F(AVFSession, FailsToStartByAnException) {
    Init();
    const std::string session = Session();
    RaiseAt(Operation::StartRunning, "no start");
    const CTraceLog trace;
    EXPECT_EQ(capturer->startRun(), -1);
    EXPECT_FALSE(capturer->isRunning());
    const Lines errors = trace.LinesContaining("ERROR");
    ASSERT_EQ(errors.size(), 1u);
    EXPECT_TRUE(IsLineAt(errors[0],
                         Error("[ShareAVFCapturer startRun] catch exception: no start, capture session = " +
                               session + ", self = " + Self()),
                         FILE_OF_LIFE));
    EXPECT_TRUE(trace.Contains(Info("[ShareAVFCapturer startRun returned with ] -1")));
    EXPECT_TRUE(Shares(1)) << "input and output are gone";
    StartAndTake();
}

TEST_F(AVFSession, FailsToStartWhenItDoesNotRunThen) {
    Init();
    script->Fail(Operation::StartRunning);
    const CTraceLog trace;
    EXPECT_EQ(capturer->startRun(), -1);
    EXPECT_FALSE(trace.Contains("ERROR"));
    EXPECT_TRUE(trace.Contains(Info("[ShareAVFCapturer startRun returned with ] -1")));
    EXPECT_TRUE(Shares(1));
    EXPECT_EQ(capturer->updateVideoFormat(), -1);
    StartAndTake();
}

TEST_F(AVFSession, LetsOtherExceptionsOfAStartPass) {
    Init();
    ThrowAt(Operation::StartRunning);
    EXPECT_THROW(capturer->startRun(), std::runtime_error);
    EXPECT_EQ(capturer.use_count(), 2) << "it stays configured";
    EXPECT_EQ(capturer->stopRun(), 0);
    EXPECT_EQ(capturer.use_count(), 2);
    EXPECT_EQ(capturer->destroyVideoInputAndOutput(), 0);
    EXPECT_TRUE(Shares(1));
    StartAndTake();
}

// ---- A stop that fails

TEST_F(AVFSession, IsAliveAfterAStopThatRaised) {
    StartAndTake();
    RaiseAt(Operation::StopRunning, "no stop");
    const CTraceLog trace;
    EXPECT_EQ(capturer->stopRun(), -1);
    EXPECT_TRUE(capturer->isRunning());
    const Lines errors = trace.LinesContaining("ERROR");
    ASSERT_EQ(errors.size(), 2u);
    EXPECT_TRUE(
        IsLineAt(errors[0], Error("[ShareAVFCapturer stopRun] catch exception: no stop"), FILE_OF_LIFE));
    EXPECT_TRUE(IsLineAt(errors[1],
                         Error("[ShareAVFCapturer stopRun] CaptureSession is alive after stopRunnig"),
                         FILE_OF_LIFE));
    EXPECT_TRUE(Shares(1)) << "input and output are gone all the same";
    EXPECT_EQ(capturer->stopRun(), 0);
    EXPECT_FALSE(capturer->isRunning());
}

TEST_F(AVFSession, FailsToStopWhenItEndedWhileThatRaised) {
    StartAndTake();
    script->Do(Operation::StopRunning, [this] {
        Die();
        throw NSException("Name", "no stop");
    });
    const CTraceLog trace;
    EXPECT_EQ(capturer->stopRun(), -1);
    EXPECT_FALSE(trace.Contains("is alive"));
    EXPECT_TRUE(Shares(1));
}

TEST_F(AVFSession, IsAliveAfterAStopThatDidNothing) {
    StartAndTake();
    script->Fail(Operation::StopRunning);
    const CTraceLog trace;
    EXPECT_EQ(capturer->stopRun(), -1);
    EXPECT_TRUE(capturer->isRunning());
    EXPECT_EQ(WithoutSourcePlaces(trace.LinesContaining("ERROR")),
              Lines{Error("[ShareAVFCapturer stopRun] CaptureSession is alive after stopRunnig")});
    EXPECT_TRUE(Shares(1));
}

TEST_F(AVFSession, KeepsOtherExceptionsOfAStopUntilAllIsDestroyed) {
    StartAndTake();
    ThrowAt(Operation::StopRunning);
    EXPECT_THROW(capturer->stopRun(), std::runtime_error);
    EXPECT_TRUE(capturer->isRunning());
    EXPECT_EQ(capturer->updateVideoFormat(), -1) << "there is no output";
    EXPECT_TRUE(Shares(1));
    EXPECT_EQ(capturer->stopRun(), 0);
    StartAndTake();
}

// ---- A session that dies

TEST_F(AVFSession, TellsOfItsDeathAndChangesNothing) {
    StartAndTake();
    const std::string session = Session();
    const CTraceLog trace;
    desktop->FailNext(Server::TakeNewest, PictureOutcome::Gone);
    ASSERT_TRUE(Comes([&] { return trace.Contains("didStopRunning"); }));
    const Lines lines = trace.LinesContaining("[ShareAVFCapturer");
    ASSERT_EQ(lines.size(), 2u);
    EXPECT_TRUE(IsLineAt(
        lines[0],
        Warning("[ShareAVFCapturer runtimeError] capture session happen runtime error, capture session = " +
                session + "The display is not there any more., self = " + Self()),
        FILE_OF_LIFE));
    EXPECT_EQ(
        lines[1],
        Info("[ShareAVFCapturer didStopRunning] capture session has stopped running, capture session = " +
             session));
    EXPECT_EQ(Capture(), NO_DATA);
    EXPECT_EQ(capturer.use_count(), 2) << "the queue is still there";
    EXPECT_EQ(capturer->stopRun(), 0);
    EXPECT_EQ(capturer.use_count(), 2) << "and a stop does nothing about it";
    EXPECT_EQ(capturer->destroyVideoInputAndOutput(), 0);
    EXPECT_TRUE(Shares(1));
}

TEST_F(AVFSession, CanBeStartedAgainAfterItsDeath) {
    StartAndTake();
    Die();
    EXPECT_EQ(capturer->startRun(), -1);
    desktop->FindAgain();
    StartAndTake();
    EXPECT_TRUE(Shares(2));
}

// ---- Another display while it runs

TEST_F(AVFSession, GoesOverToAnotherDisplay) {
    StartAndTake();
    const CTraceLog trace;
    EXPECT_EQ(capturer->setInputDisplay(SIDE), 0);
    EXPECT_TRUE(capturer->isRunning());
    EXPECT_TRUE(trace.Contains(Info("[ShareAVFCapturer initDisplay displayed changed]")));
    ASSERT_TRUE(TakesPicture());
    EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{20, 20}));
    EXPECT_EQ(Rgb(5, 5), BLUE);
    EXPECT_EQ(capturer->getCaptureRect(), (CGRect{{40, 0}, {20, 20}}));
    EXPECT_EQ(Calls(Operation::StopRunning), 1u);
    EXPECT_EQ(Calls(Operation::StartRunning), 2u);
    EXPECT_EQ(Calls(Operation::VideoDataOutputInit), 1u) << "the output is kept";
    EXPECT_EQ(capturer.use_count(), 2);
}

TEST_F(AVFSession, IsStartedByAnotherDisplay) {
    Init();
    EXPECT_EQ(capturer->createVideoInputAndOutput(), 0);
    EXPECT_EQ(capturer->setInputDisplay(SIDE), 0);
    EXPECT_TRUE(capturer->isRunning());
    EXPECT_EQ(Calls(Operation::StopRunning), 0u);
    ASSERT_TRUE(TakesPicture());
    EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{20, 20}));
}

TEST_F(AVFSession, IsStartedAgainOnADisplayThatIsNotThere) {
    StartAndTake();
    EXPECT_EQ(capturer->setInputDisplay(99), -1);
    EXPECT_TRUE(capturer->isRunning());
    EXPECT_EQ(capturer->setInputDisplay(SIDE), 0);
    ASSERT_TRUE(TakesPicture());
    EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{20, 20}));
}

TEST_F(AVFSession, LetsPassWhatTheStopForAnotherDisplayRaises) {
    StartAndTake();
    RaiseAt(Operation::StopRunning, "no stop");
    EXPECT_THROW(capturer->setInputDisplay(SIDE), NSException);
    EXPECT_TRUE(capturer->isRunning());
    ThrowAt(Operation::StopRunning);
    EXPECT_THROW(capturer->setInputDisplay(MAIN), std::runtime_error);
    int rate = 0;
    {
        const CCallOnThread call([&] { rate = capturer->setFPS(10); });
    }
    EXPECT_EQ(rate, 10) << "no lock is left behind";
}

TEST_F(AVFSession, FailsOnAnotherDisplayWhenTheStartRaises) {
    StartAndTake();
    const std::string session = Session();
    RaiseAt(Operation::StartRunning, "no start");
    const CTraceLog trace;
    EXPECT_EQ(capturer->setInputDisplay(SIDE), -1);
    EXPECT_FALSE(capturer->isRunning());
    const Lines errors = trace.LinesContaining("ERROR");
    ASSERT_EQ(errors.size(), 1u);
    EXPECT_TRUE(IsLineAt(errors[0],
                         Error("[ShareAVFCapturer startRun] catch exception: no start, capture session = " +
                               session + ", self = " + Self()),
                         FILE_OF_LIFE));
    EXPECT_EQ(capturer.use_count(), 2) << "it stays configured";
    EXPECT_EQ(capturer->setInputDisplay(SIDE), 0);
    ASSERT_TRUE(TakesPicture());
}

TEST_F(AVFSession, LetsOtherExceptionsOfTheStartOnAnotherDisplayPass) {
    StartAndTake();
    ThrowAt(Operation::StartRunning);
    EXPECT_THROW(capturer->setInputDisplay(SIDE), std::runtime_error);
    EXPECT_FALSE(capturer->isRunning());
    EXPECT_EQ(capturer->setInputDisplay(SIDE), 0);
}

TEST_F(AVFSession, IsNotToldToFailByAStartThatDidNothing) {
    StartAndTake();
    script->Fail(Operation::StartRunning);
    EXPECT_EQ(capturer->setInputDisplay(SIDE), 0);
    EXPECT_FALSE(capturer->isRunning());
}

// ---- Anew

TEST_F(AVFSession, BeginsAnewWithAPictureOfNow) {
    StartAndTake();
    const unsigned looks = Looks();
    Paint(GREEN);
    ASSERT_TRUE(Comes([&] { return Looks() > looks; }));
    Paint(BLUE);
    capturer->beginAnew();
    EXPECT_TRUE(capturer->isRunning());
    ASSERT_TRUE(TakesPicture());
    EXPECT_EQ(Rgb(5, 5), BLUE);
    EXPECT_EQ(Calls(Operation::StopRunning), 1u);
    EXPECT_EQ(Calls(Operation::StartRunning), 2u);
}

TEST_F(AVFSession, IsNotStartedByBeginningAnew) {
    Init();
    EXPECT_EQ(capturer->createVideoInputAndOutput(), 0);
    capturer->beginAnew();
    EXPECT_FALSE(capturer->isRunning());
    EXPECT_EQ(Calls(Operation::StartRunning), 0u);
}

TEST_F(AVFSession, BeginsAnewWithoutAnExceptionOfItsStopAndStart) {
    StartAndTake();
    const std::string session = Session();
    RaiseAt(Operation::StopRunning, "no stop");
    RaiseAt(Operation::StartRunning, "no start");
    const CTraceLog trace;
    EXPECT_NO_THROW(capturer->beginAnew());
    EXPECT_TRUE(capturer->isRunning()) << "nothing has stopped it";
    EXPECT_EQ(WithoutSourcePlaces(trace.LinesContaining("ERROR")),
              (Lines{Error("[ShareAVFCapturer stopRun] catch exception: no stop"),
                     Error("[ShareAVFCapturer startRun] catch exception: no start, capture session = " +
                           session + ", self = " + Self())}));
}
