// SPDX-License-Identifier: Apache-2.0
#include "platform/av_foundation.h"

#include "tests/platform/av_foundation_rig.h"
#include "tests/support/call_on_thread.h"
#include "tests/support/test_effort.h"
#include "tests/support/threads.h"

#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <iostream>
#include <memory>
#include <mutex>
#include <random>
#include <thread>

/// Sessions that are stopped, dropped and put to rest from everywhere, and the threads that are left.

namespace {

using namespace platform;

class AVFoundationLife : public CSessionRig {
protected:
    AVFoundationLife() {
        // The pool's thread is there before threads are counted.
        UntilQueueIsEmpty();
        threads = CountThreadsOfProcess();
    }

    void ExpectThreads(std::ptrdiff_t count) const { EXPECT_EQ(WaitForThreadsOfProcess(count), count); }

    std::ptrdiff_t threads = 0;
};

void YieldOften() {
    for (int i = 0; i < 50; ++i)
        std::this_thread::yield();
}

} // namespace

TEST_F(AVFoundationLife, AStopWaitsForTheDelegatesCall) {
    CGate gate;
    CTally entered;
    std::atomic<bool> over{false};
    taker->inside = [&](const CMSampleBufferRef&) {
        entered.Add();
        EXPECT_TRUE(gate.Passes());
        over = true;
    };
    Start();
    ASSERT_TRUE(entered.Reaches(1));
    bool wasOver = false;
    CCallOnThread stop([&] {
        session->stopRunning();
        wasOver = over;
    });
    CCallOnThread second([&] { session->stopRunning(); });
    stop.UntilItWaits();
    second.UntilItWaits();
    EXPECT_FALSE(stop.HasReturned());
    EXPECT_FALSE(second.HasReturned());
    EXPECT_FALSE(session->isRunning());
    gate.Open();
    while (!stop.HasReturned() || !second.HasReturned())
        std::this_thread::yield();
    EXPECT_TRUE(wasOver);
}

TEST_F(AVFoundationLife, ADelegateMayStopAndStartItsSession) {
    std::atomic<bool> ranAfterStop{true};
    CGate mayStop;
    taker->inside = [&](const CMSampleBufferRef&) {
        if (taker->came.Count() != 0)
            return;
        EXPECT_TRUE(mayStop.Passes());
        session->stopRunning();
        ranAfterStop = session->isRunning();
        session->startRunning();
    };
    Start();
    mayStop.Open();
    ASSERT_TRUE(taker->came.Reaches(2));
    EXPECT_FALSE(ranAfterStop);
    EXPECT_TRUE(session->isRunning());
    session->stopRunning();
    ExpectThreads(threads);
}

TEST_F(AVFoundationLife, ADelegateMayDropTheLastShareOfItsSession) {
    std::weak_ptr<AVCaptureSession> gone = session;
    CGate mayDrop;
    taker->inside = [&](const CMSampleBufferRef&) {
        EXPECT_TRUE(mayDrop.Passes());
        session = nullptr;
    };
    Start();
    mayDrop.Open();
    ASSERT_TRUE(taker->came.Reaches(1));
    EXPECT_TRUE(gone.expired());
    ExpectThreads(threads);
    UntilQueueIsEmpty();
    EXPECT_EQ(output.use_count(), 1);
}

TEST_F(AVFoundationLife, ASessionsQueueIsFinishedOnceItsOutputIsGone) {
    static std::atomic<CTally*> finished{nullptr};
    CTally tally;
    finished = &tally;
    dispatch_set_context(queue, &tally);
    dispatch_set_finalizer_f(queue, [](void*) { finished.load()->Add(); });
    StartAndTake();
    session->stopRunning();
    session->removeOutput(output);
    output = nullptr;
    queue = nullptr;
    EXPECT_TRUE(tally.Reaches(1));
}

TEST_F(AVFoundationLife, AnErrorsObserverMayStopDropAndStartTheSession) {
    for (const bool drops : {false, true}) {
        const auto ear = std::make_unique<CSessionEar>(session);
        ear->inside = [&](const AVCaptureNotification& told) {
            if (told.name != AVCaptureSessionRuntimeErrorNotification)
                return;
            session->stopRunning();
            if (drops)
                session = nullptr;
            else
                session->startRunning();
        };
        StartAndTake();
        server->FailNext(SimulatedOperation::TakeNewest, PictureOutcome::Gone);
        Tick();
        ASSERT_TRUE(ear->Hears(3));
        EXPECT_EQ(session == nullptr, drops);
        if (session != nullptr)
            session->stopRunning();
        ExpectThreads(threads);
    }
}

TEST_F(AVFoundationLife, NoThreadMeansNoRunning) {
    const CSessionEar ear(session);
    {
        const CNoNewThreadsScope none;
        session->startRunning();
        EXPECT_FALSE(session->isRunning());
        EXPECT_EQ(ear.Heard(), "E");
    }
    StartAndTake();
}

TEST_F(AVFoundationLife, ARestTakesTheThreadAndWakeBringsItBack) {
    const CSessionEar ear(session);
    StartAndTake();
    Rest();
    ExpectThreads(threads - 1); // that of the pool is gone, too
    EXPECT_TRUE(session->isRunning());
    ColourWindow(0x00FF00);
    const unsigned looks = Looks();
    clock->Advance(std::chrono::seconds(1));
    EXPECT_EQ(Looks(), looks);
    Wake();
    ASSERT_TRUE(taker->came.Reaches(2));
    EXPECT_EQ(taker->Last().At(0, 0), RIG_GREEN);
    TakeNext(2);
    EXPECT_EQ(ear.Heard(), "S");
}

TEST_F(AVFoundationLife, AStartEndsTheSleepToo) {
    StartAndTake();
    Rest();
    session->startRunning();
    EXPECT_TRUE(taker->came.Reaches(2));
}

TEST_F(AVFoundationLife, ASessionStoppedAsleepStaysStopped) {
    const CSessionEar ear(session);
    StartAndTake();
    Rest();
    session->stopRunning();
    EXPECT_EQ(ear.Heard(), "SX");
    Wake();
    EXPECT_FALSE(session->isRunning());
    ExpectThreads(threads - 1);
}

TEST_F(AVFoundationLife, ADisplayThatGoesDuringTheSleepIsAnErrorOnWaking) {
    const CSessionEar ear(session);
    StartAndTake();
    Rest();
    ASSERT_TRUE(server->RemoveDisplay(RIG_DISPLAY));
    Wake();
    EXPECT_FALSE(session->isRunning());
    EXPECT_EQ(ear.Heard(), "SEX");
}

TEST_F(AVFoundationLife, ADeadSessionIsNotWoken) {
    const CSessionEar ear(session);
    StartAndTake();
    server->FailNext(SimulatedOperation::TakeNewest, PictureOutcome::Gone);
    Tick();
    ASSERT_TRUE(ear.Hears(3));
    Rest();
    Wake();
    EXPECT_FALSE(session->isRunning());
    ExpectThreads(threads - 1);
}

TEST_F(AVFoundationLife, ARestFromInsideADelegateWaitsForNothing) {
    taker->inside = [&](const CMSampleBufferRef&) { Rest(); };
    Start();
    ASSERT_TRUE(taker->came.Reaches(1));
    Rest();
    ExpectThreads(threads - 1);
}

TEST_F(AVFoundationLife, ASessionStartedWhileThePlatformRestsSleeps) {
    CGate resting;
    dispatch_async(queue, [&] {
        EXPECT_TRUE(resting.Passes());
        session->startRunning();
    });
    {
        const CCallOnThread rest([] { Rest(); });
        rest.UntilItWaits();
        resting.Open();
    }
    ExpectThreads(threads - 1);
    EXPECT_TRUE(session->isRunning());
    Wake();
    EXPECT_TRUE(taker->came.Reaches(1));
}

TEST_F(AVFoundationLife, ThreadsReturnAfterManyStartsAndStops) {
    const int rounds = TestRounds(50);
    for (int i = 0; i < rounds; ++i) {
        session->startRunning();
        if (i % 3 == 0) {
            ASSERT_TRUE(taker->came.Reaches(i / 3 + 1));
        }
        session->stopRunning();
    }
    std::cout << rounds << " rounds\n";
    ExpectThreads(threads);
}

/// Samples at each tick, stops from outside and from the delegate, rests, and no call that begins after a
/// stop.
TEST_F(AVFoundationLife, NoCallBeginsAfterAStopHoweverTheyRace) {
    const int rounds = TestRounds(150);
    const unsigned seed = std::random_device()();
    std::mt19937 random(seed);
    std::atomic<bool> stopped{true};
    std::atomic<int> late{0};
    std::atomic<int> calls{0};
    std::atomic<bool> stopsItself{false};
    taker->inside = [&](const CMSampleBufferRef&) {
        ++calls;
        if (stopped)
            ++late;
        if (stopsItself)
            session->stopRunning();
        YieldOften();
        if (stopped)
            ++late;
    };
    std::atomic<bool> over{false};
    std::thread mover([&] {
        for (std::uint32_t colour = 0; !over; ++colour) {
            server->SetContent(RIG_WINDOW, SimulatedContent::Colour(colour & 0xFFFFFF));
            clock->Advance(RIG_PERIOD);
            std::this_thread::yield();
        }
    });
    // And then until enough was seen, which is a matter of how the threads meet.
    const auto limit = std::chrono::steady_clock::now() + PATIENCE;
    for (int i = 0; i < rounds || (calls <= rounds / 10 && std::chrono::steady_clock::now() < limit); ++i) {
        stopsItself = random() % 4 == 0;
        const int before = calls;
        stopped = false;
        session->startRunning();
        while (random() % 4 != 0 && calls == before)
            std::this_thread::yield();
        if (random() % 8 == 0)
            Rest();
        if (!stopsItself && random() % 2 == 0) {
            // Samples wait behind this until the stop is over.
            dispatch_async(queue, [&] {
                while (!stopped)
                    std::this_thread::yield();
            });
            YieldOften();
        }
        session->stopRunning();
        if (stopsItself)
            UntilQueueIsEmpty(); // a delegate that stops its session is still in its call
        stopped = true;
        UntilQueueIsEmpty();
    }
    over = true;
    mover.join();
    UntilQueueIsEmpty();
    std::cout << rounds << " rounds, " << calls << " calls, seed " << seed << "\n";
    EXPECT_EQ(late, 0);
    EXPECT_GT(calls, rounds / 10);
    Rest();
    ExpectThreads(threads - 1);
}

/// Sessions that end anywhere: on the delegate's thread, here, or by the display.
TEST_F(AVFoundationLife, SessionsMayEndAnywhere) {
    const int rounds = TestRounds(100);
    const unsigned seed = std::random_device()();
    std::mt19937 random(seed);
    for (int i = 0; i < rounds; ++i) {
        auto mine = AVCaptureSession::init();
        auto itsOutput = AVCaptureVideoDataOutput::init();
        const auto itsTaker = std::make_shared<CSampleTaker>();
        std::mutex mutex;
        std::shared_ptr<AVCaptureSession> dropped = random() % 2 == 0 ? mine : nullptr;
        itsTaker->inside = [&](const CMSampleBufferRef&) {
            std::shared_ptr<AVCaptureSession> last;
            const std::lock_guard<std::mutex> lock(mutex);
            last.swap(dropped);
        };
        itsOutput->setSampleBufferDelegate(itsTaker, queue);
        mine->addInput(AVCaptureScreenInput::initWithDisplayID(RIG_DISPLAY));
        mine->addOutput(itsOutput);
        if (random() % 3 == 0)
            server->FailNext(SimulatedOperation::TakeNewest, PictureOutcome::Gone);
        mine->startRunning();
        if (random() % 2 == 0)
            std::this_thread::yield();
        mine = nullptr;
        UntilQueueIsEmpty();
        std::shared_ptr<AVCaptureSession> rest; // whose end waits for the delegate, which takes the mutex
        const std::lock_guard<std::mutex> lock(mutex);
        rest.swap(dropped);
    }
    std::cout << rounds << " rounds, seed " << seed << "\n";
    Rest();
    ExpectThreads(threads - 1);
}
