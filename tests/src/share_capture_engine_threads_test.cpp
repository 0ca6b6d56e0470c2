// SPDX-License-Identifier: Apache-2.0
#include "tests/support/engine_bench.h"
#include "tests/support/test_effort.h"

#include <gtest/gtest.h>
#include <pthread.h>

#include <array>
#include <csignal>
#include <string>
#include <thread>
#include <vector>

/// The engine's threads: their names, what runs on them, and that none is left.

namespace {

using Lines = std::vector<std::string>;

std::string NameOfThisThread() {
    std::array<char, 16> name{};
    EXPECT_EQ(pthread_getname_np(pthread_self(), name.data(), name.size()), 0);
    return name.data();
}

/// Those that a program can block at all.
bool AreAllSignalsBlocked() {
    sigset_t blocked;
    sigemptyset(&blocked);
    pthread_sigmask(SIG_BLOCK, nullptr, &blocked);
    for (int signal = 1; signal <= SIGRTMAX; ++signal) {
        const bool reserved = signal > SIGSYS && signal < SIGRTMIN; // the C library's own
        if (reserved || signal == SIGKILL || signal == SIGSTOP)
            continue;
        if (sigismember(&blocked, signal) != 1)
            return false;
    }
    return true;
}

} // namespace

TEST(ShareCaptureEngineThreads, AreGoneAfter200RoundsOfStartAndStop) {
    CEngineBench<> bench;
    const std::ptrdiff_t threads = CountThreadsAtRest();
    const int rounds = 200 * TestEffort();
    for (int round = 0; round < rounds; ++round) {
        bench.Start();
        if (round % 10 == 0)
            bench.Tick();
        ASSERT_EQ(bench.engine->Stop(), 0);
        bench.trace.Clear();
    }
    EXPECT_EQ(bench.sink.FrameCount(), static_cast<std::size_t>(rounds / 10));
    EXPECT_TRUE(ThreadsComeDownTo(threads));
    EXPECT_EQ(bench.capturer.Sink(), nullptr);
}

TEST(ShareCaptureEngineThreads, AreGoneAfter200EnginesWereCreatedAndDestroyed) {
    const std::ptrdiff_t threads = CountThreadsAtRest();
    CCallLog calls;
    CRecordingSink sink(calls);
    CFakeCapturer capturer(calls);
    for (int i = 0; i < 200 * TestEffort(); ++i) {
        const auto kind = static_cast<SHARE_CAPTURE_ENGINE_TYPE>(1 + i % 4);
        IShareCaptureEngine* const engine = CreateShareCaptureEngine(kind);
        ASSERT_NE(engine, nullptr);
        EXPECT_EQ(engine->SetSink(&sink), 0);
        const bool hasOwn = kind == SHARE_CAPTURE_ENGINE_TYPE_DESKTOP;
        const bool runs = engine->SetExternalIShareCapturer(&capturer) == 0 || hasOwn;
        EXPECT_EQ(engine->Start(), runs ? 0 : -6) << "without anything to share";
        ASSERT_EQ(DestroyShareCaptureEngine(engine), 0);
    }
    EXPECT_TRUE(ThreadsComeDownTo(threads));
}

TEST(ShareCaptureEngineThreads, AreGoneWhenAnEngineThatOnlyHadASinkIsDestroyed) {
    const std::ptrdiff_t threads = CountThreadsAtRest();
    {
        CEngineBench<> bench;
        EXPECT_EQ(bench.engine->SetSink(&bench.sink), 0);
        EXPECT_EQ(CountThreadsOfProcess(), threads + 2) << "of the events, and of the displays' notices";
    }
    EXPECT_TRUE(ThreadsComeDownTo(threads));
}

TEST(ShareCaptureEngineThreads, AreOneMoreForTheWorkerAndOneForTheEvents) {
    CEngineBench<> first;
    const std::ptrdiff_t threads = CountThreadsOfProcess(); // that of the displays' notices is there already
    EXPECT_EQ(first.engine->Start(), 0);
    EXPECT_EQ(CountThreadsOfProcess(), threads + 2);
    EXPECT_EQ(first.engine->Stop(), 0);
    EXPECT_TRUE(ThreadsComeDownTo(threads));
}

TEST(ShareCaptureEngineThreads, CarryTheirNamesAndBlockAllSignals) {
    CEngineBench<> bench;
    std::string worker;
    std::string assist;
    bool workerBlocks = false;
    bool assistBlocks = false;
    bench.sink.SetFrameHook([&](IShareFrame*) {
        worker = NameOfThisThread();
        workerBlocks = AreAllSignalsBlocked();
    });
    bench.sink.SetNoticeHook([&](const std::string&) {
        assist = NameOfThisThread();
        assistBlocks = AreAllSignalsBlocked();
    });
    bench.Start();
    bench.Tick();
    EXPECT_EQ(bench.engine->_GetAssistThread()->GetName(),
              "scn-cap-assist-{6F923E32-2392-4FE0-9F9E-BBE5C305E053}");
    EXPECT_EQ(bench.engine->_GetWorker()->GetName(), "scn-cap");
    EXPECT_EQ(bench.engine->Stop(), 0);
    EXPECT_EQ(worker, "scn-cap");
    EXPECT_EQ(assist, "scn-cap-assist-");
    EXPECT_TRUE(workerBlocks);
    EXPECT_TRUE(assistBlocks);
    EXPECT_FALSE(AreAllSignalsBlocked()) << "the caller's own mask must come back";
}

TEST(ShareCaptureEngineThreads, BringFramesOnTheWorkerAndEventsOnTheAssistThread) {
    CEngineBench<> bench;
    bench.Start();
    bench.Tick();
    bench.SettleEvents();
    const CmThreadId worker = bench.engine->_GetWorker()->GetThreadId();
    const CmThreadId assist = bench.engine->_GetAssistThread()->GetThreadId();
    ASSERT_EQ(bench.sink.FrameCount(), 1u);
    EXPECT_EQ(bench.sink.Frames()[0].thread, worker);
    EXPECT_EQ(bench.sink.ThreadOfNotice("status 1"), assist);
    EXPECT_NE(worker, assist);
    EXPECT_NE(worker, GetThreadSelfId());
    EXPECT_NE(assist, GetThreadSelfId());
}

TEST(ShareCaptureEngineThreads, ShareOneAssistThreadAmongEngines) {
    CEngineBench<> first;
    CEngineProbe<CShareCaptureEngine> second;
    CRecordingSink secondSink(first.calls);
    first.Start();
    EXPECT_EQ(second.SetSink(&secondSink), 0);
    EXPECT_EQ(second._GetAssistThread(), first.engine->_GetAssistThread());
    EXPECT_EQ(first.engine->Stop(), 0);
    second.OnCaptureError(-204);
    Settle(*second._GetAssistThread());
    EXPECT_EQ(secondSink.Notices(), Lines{"error -204"}) << "the first Stop took the others' events away";
    EXPECT_EQ(second.SetSink(nullptr), 0);
}

TEST(ShareCaptureEngineThreads, RunAPassOutOfTurnWhenItIsFired) {
    CEngineBench<> bench;
    bench.engine->_FireCaptureEvent(); // no worker: nothing
    bench.Start();
    bench.engine->_FireCaptureEvent();
    Settle(*bench.engine->_GetWorker());
    EXPECT_EQ(bench.sink.FrameCount(), 1u);
    // On the worker itself it does nothing, so a pass cannot start another one.
    bench.engine->RunOnCaptureThread([&] {
        bench.engine->_FireCaptureEvent();
        return 0u;
    });
    Settle(*bench.engine->_GetWorker());
    EXPECT_EQ(bench.sink.FrameCount(), 1u);
}

TEST(ShareCaptureEngineThreads, RunClosuresInlineWithoutAWorkerAndPostedWithOne) {
    CEngineBench<> bench;
    CmThreadId ranOn = 0;
    const auto closure = [&] {
        ranOn = GetThreadSelfId();
        return 42u;
    };
    EXPECT_EQ(bench.engine->RunOnCaptureThread(closure), 42);
    EXPECT_EQ(ranOn, GetThreadSelfId());
    EXPECT_EQ(bench.engine->RunOnCaptureThread(nullptr), -1);
    bench.Start();
    EXPECT_EQ(bench.engine->RunOnCaptureThread(closure), 0);
    EXPECT_EQ(bench.engine->RunOnCaptureThread(nullptr), 0);
    Settle(*bench.engine->_GetWorker());
    EXPECT_EQ(ranOn, bench.engine->_GetWorker()->GetThreadId());
}

TEST(ShareCaptureEngineThreads, RunAClosureInlineWhenAPassAsksForIt) {
    CEngineBench<> bench;
    int result = 0;
    bench.capturer.SetHook(
        [&](IShareFrame*) { result = bench.engine->RunOnCaptureThread([] { return 42u; }); });
    bench.Start();
    bench.Tick();
    EXPECT_EQ(result, 42);
}

TEST(ShareCaptureEngineThreads, EndWithTheOwnCapturersStopAsTheWorkersLastAct) {
    CEngineBench<CShareCaptureDesktopEngine> bench;
    bench.capturer.Change([](CFakeCapturer::Answers& answers) { answers.display = 1; });
    bench.Start();
    bench.Tick();
    bench.engine->RunOnCaptureThread([&] {
        bench.calls.Add("closure");
        return 0u;
    });
    EXPECT_EQ(bench.engine->Stop(), 0);
    const Lines calls = bench.calls.Calls();
    ASSERT_GE(calls.size(), 3u);
    EXPECT_EQ(Lines(calls.end() - 3, calls.end()),
              (Lines{"closure", "capturer Stop", "capturer RemoveSink"}));
}

TEST(ShareCaptureEngineThreads, NeverStopAnExternalCapturer) {
    CEngineBench<> bench;
    bench.Start();
    bench.Tick();
    EXPECT_EQ(bench.engine->Stop(), 0);
    EXPECT_EQ(bench.calls.Count("capturer Stop"), 0u);
}

TEST(ShareCaptureEngineThreads, TickNoMoreAfterStop) {
    CEngineBench<> bench;
    bench.Start();
    bench.Tick(3);
    EXPECT_EQ(bench.engine->Stop(), 0);
    EXPECT_EQ(bench.engine->_GetWorker(), nullptr);
    EXPECT_EQ(bench.engine->m_tickLastCapture, 0u);
    bench.Advance(10000);
    EXPECT_EQ(bench.calls.Count("Capture"), 3u);
}
