// SPDX-License-Identifier: Apache-2.0
#include "tests/support/call_on_thread.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <atomic>
#include <string>
#include <vector>

/// Stop, Destroy and the rest, called from inside callbacks and beside passes.

namespace {

using Lines = std::vector<std::string>;

const std::string IMPL = "src/share_capture_engine_impl";
const std::string REFUSED = "[CShareCaptureEngine::Stop]>>fail>>called from inside a callback of this engine";

template <class Bench>
void ExpectStillRunning(Bench& bench) {
    EXPECT_EQ(bench.engine->GetCaptureStatus(), SHARE_CAPTURE_ENGINE_STATUS_STARTED);
    EXPECT_EQ(bench.capturer.Sink(), bench.engine);
    bench.sink.SetFrameHook(nullptr);
    bench.sink.SetNoticeHook(nullptr);
    bench.capturer.SetHook(nullptr);
    const std::size_t frames = bench.sink.FrameCount();
    bench.Tick();
    EXPECT_EQ(bench.sink.FrameCount(), frames + 1);
}

/// Stops and destroys the engine, and expects to be refused twice.
template <class Bench>
void TryToEnd(Bench& bench, std::vector<int>& results) {
    results.push_back(bench.engine->Stop());
    results.push_back(DestroyShareCaptureEngine(bench.engine));
}

template <class Bench>
void ExpectRefusals(Bench& bench, const std::vector<int>& results) {
    EXPECT_EQ(results, (std::vector<int>{-1, -1}));
    const Lines lines = bench.trace.LinesContaining("CShareCaptureEngine::Stop]");
    EXPECT_EQ(lines.size(), 2u);
    EXPECT_TRUE(AreAllAt(lines, Error(REFUSED), IMPL));
    ExpectStillRunning(bench);
}

struct AssistCase {
    const char* notice;
    void (*cause)(CShareCaptureEngine&);
};

class AssistCallback : public testing::TestWithParam<AssistCase> {};

} // namespace

TEST(ShareCaptureEngineCallbacks, RefuseToEndTheEngineFromInsideAFrame) {
    CEngineBench<> bench;
    std::vector<int> results;
    bench.sink.SetFrameHook([&](IShareFrame*) { TryToEnd(bench, results); });
    bench.Start();
    bench.Tick();
    ExpectRefusals(bench, results);
}

TEST(ShareCaptureEngineCallbacks, RefuseToEndTheEngineFromInsideACapture) {
    CEngineBench<> bench;
    std::vector<int> results;
    bench.capturer.SetHook([&](IShareFrame*) { TryToEnd(bench, results); });
    bench.Start();
    bench.Tick();
    ExpectRefusals(bench, results);
}

TEST(ShareCaptureEngineCallbacks, RefuseToEndTheEngineFromAClosureOnItsWorker) {
    CEngineBench<> bench;
    std::vector<int> results;
    bench.Start();
    bench.engine->RunOnCaptureThread([&] {
        TryToEnd(bench, results);
        return 0u;
    });
    Settle(*bench.engine->_GetWorker());
    ExpectRefusals(bench, results);
}

TEST_P(AssistCallback, RefusesToEndItsEngine) {
    CEngineBench<> bench;
    std::vector<int> results;
    bench.Start();
    bench.SettleEvents();
    bench.sink.SetNoticeHook([&](const std::string& text) {
        if (text == GetParam().notice)
            TryToEnd(bench, results);
    });
    GetParam().cause(*bench.engine);
    bench.SettleEvents();
    ExpectRefusals(bench, results);
}

INSTANTIATE_TEST_SUITE_P(
    All, AssistCallback,
    testing::Values(
        AssistCase{"status 3",
                   [](CShareCaptureEngine& engine) {
                       EXPECT_EQ(engine.Pause(), 0);
                       EXPECT_EQ(engine.Resume(), 0);
                   }},
        AssistCase{"error -204", [](CShareCaptureEngine& engine) { engine.OnCapturedNoSharedApp(); }},
        AssistCase{"event 1 1",
                   [](CShareCaptureEngine& engine) { engine.OnCapturedAppsCrossMultiMonitors(true); }},
        AssistCase{"position 1,2 3x4",
                   [](CShareCaptureEngine& engine) { engine.OnCapturePositionChanged(1, 2, 3, 4); }},
        AssistCase{"size 5x6",
                   [](CShareCaptureEngine& engine) {
                       engine.OnCapturedDisplaySizedChanged({5, 6});
                   }},
        AssistCase{"windows 7,8,", [](CShareCaptureEngine& engine) {
                       std::vector<unsigned> windows{7, 8};
                       engine.OnCapturedWindowChanged(windows);
                   }}));

TEST(ShareCaptureEngineCallbacks, RefuseToEndAStoppedEngineToo) {
    CEngineBench<> bench;
    std::vector<int> results;
    EXPECT_EQ(bench.engine->SetSink(&bench.sink), 0);
    bench.sink.SetNoticeHook([&](const std::string&) { TryToEnd(bench, results); });
    bench.engine->OnCaptureError(-204);
    bench.SettleEvents();
    EXPECT_EQ(results, (std::vector<int>{-1, -1}));
    EXPECT_EQ(bench.engine->GetCaptureStatus(), SHARE_CAPTURE_ENGINE_STATUS_STOPPED);
}

TEST(ShareCaptureEngineCallbacks, MayPauseResumeAndAskTheEngine) {
    CEngineBench<> bench;
    bench.sink.SetFrameHook([&](IShareFrame*) {
        EXPECT_EQ(bench.engine->Start(), 0);
        EXPECT_EQ(bench.engine->Pause(), 0);
        EXPECT_EQ(bench.engine->Resume(), 0);
        EXPECT_EQ(bench.engine->SetCaptureFps(10), 0);
        EXPECT_EQ(bench.engine->SetCaptureMaxFrameSize(640, 480), 0);
        EXPECT_EQ(bench.Statistic().nTotalFrames, 1);
        EXPECT_EQ(bench.engine->SetExternalIShareCapturer(nullptr), -1);
        EXPECT_EQ(bench.engine->SetSink(&bench.sink), 0);
    });
    bench.Start();
    bench.Tick();
    bench.SettleEvents();
    EXPECT_EQ(bench.sink.FrameCount(), 1u);
    EXPECT_EQ(bench.sink.Notices(), (Lines{"status 1", "status 3", "status 1"}));
    EXPECT_EQ(bench.calls.Count("SetFPS 10"), 1u);
    EXPECT_EQ(bench.engine->m_spShareCapturerContext->GetCaptureFps(), 10);
}

TEST(ShareCaptureEngineCallbacks, MayTakeTheSinkAwayFromInsideAFrame) {
    CEngineBench<> bench;
    bench.sink.SetFrameHook([&](IShareFrame*) { EXPECT_EQ(bench.engine->SetSink(nullptr), 0); });
    bench.Start();
    bench.Tick(3);
    EXPECT_EQ(bench.sink.FrameCount(), 1u);
    EXPECT_EQ(bench.calls.Count("Capture"), 1u);
}

TEST(ShareCaptureEngineCallbacks, MayStopAnotherEngine) {
    CEngineBench<> bench;
    CFakeCapturer otherCapturer(bench.calls);
    CEngineProbe<CShareCaptureEngine> other;
    EXPECT_EQ(other.SetExternalIShareCapturer(&otherCapturer), 0);
    EXPECT_EQ(other.Start(), 0);
    bench.Start();
    bench.SettleEvents();
    int result = 7;
    bench.sink.SetNoticeHook([&](const std::string&) { result = other.Stop(); });
    bench.engine->OnCapturedNoSharedApp();
    bench.SettleEvents();
    EXPECT_EQ(result, 0);
    EXPECT_EQ(other.GetCaptureStatus(), SHARE_CAPTURE_ENGINE_STATUS_STOPPED);

    EXPECT_EQ(other.Start(), 0);
    bench.sink.SetFrameHook([&](IShareFrame*) { result = other.Stop() + 10; });
    bench.Tick();
    EXPECT_EQ(result, 10);
    EXPECT_EQ(other.GetCaptureStatus(), SHARE_CAPTURE_ENGINE_STATUS_STOPPED);
    bench.sink.SetNoticeHook(nullptr);
}

TEST(ShareCaptureEngineCallbacks, AreToldBeforeStopComesBackAndNoneComesAfter) {
    CEngineBench<> bench;
    bench.Start();
    bench.SettleEvents();
    bench.Forget();
    for (int i = 0; i < 50; ++i)
        bench.engine->OnCaptureEvent(7, i, &bench);
    EXPECT_EQ(bench.engine->Stop(), 0);
    EXPECT_EQ(bench.sink.Notices().size(), 51u);
    EXPECT_EQ(bench.sink.Notices().front(), "event 7 0 data");
    EXPECT_EQ(bench.sink.Notices().back(), "status 2");
    EXPECT_EQ(bench.engine->OnCaptureError(-204), 0);
    EXPECT_EQ(bench.engine->_GetAssistThread(), nullptr);
    EXPECT_EQ(bench.sink.Notices().size(), 51u);
}

TEST(ShareCaptureEngineCallbacks, ThatWaitForTheAssistThreadAreToldBeforeTheEngineIsGone) {
    CEngineBench<> bench;
    CEngineProbe<CShareCaptureEngine>* const other = new CEngineProbe<CShareCaptureEngine>;
    CRecordingSink otherSink(bench.calls);
    CGate gate;
    EXPECT_EQ(bench.engine->SetSink(&bench.sink), 0);
    EXPECT_EQ(other->SetSink(&otherSink), 0);
    bench.sink.SetNoticeHook([&](const std::string&) { EXPECT_TRUE(gate.Passes()); });
    bench.engine->OnCaptureError(1); // keeps the assist thread busy
    for (int i = 0; i < 10; ++i)
        other->OnCaptureError(2);
    {
        const CCallOnThread destroy([&] {
            EXPECT_EQ(DestroyShareCaptureEngine(other), 0);
            EXPECT_EQ(otherSink.CountNotices("error 2"), 10u);
        });
        destroy.UntilItWaits();
        EXPECT_FALSE(destroy.HasReturned());
        gate.Open();
    }
    bench.sink.SetNoticeHook(nullptr);
}

TEST(ShareCaptureEngineStop, ReturnsAfterThePassInProgressAndNoTickFollows) {
    CEngineBench<> bench;
    CGate gate;
    CTally inside;
    bench.capturer.SetHook([&](IShareFrame*) {
        inside.Add();
        EXPECT_TRUE(gate.Passes());
    });
    bench.Start();
    bench.Advance(200);
    ASSERT_TRUE(inside.Reaches(1));
    {
        const CCallOnThread stop([&] {
            EXPECT_EQ(bench.engine->Stop(), 0);
            EXPECT_EQ(bench.sink.FrameCount(), 1u) << "the pass was not over";
        });
        stop.UntilItWaits();
        EXPECT_FALSE(stop.HasReturned());
        EXPECT_EQ(bench.engine->GetCaptureStatus(), SHARE_CAPTURE_ENGINE_STATUS_STARTED);
        bench.Advance(1000); // a tick that becomes due while Stop waits
        gate.Open();
    }
    EXPECT_EQ(bench.calls.Count("Capture"), 1u);
    EXPECT_EQ(bench.sink.Notices(), (Lines{"status 1", "status 2"}));
}

TEST(ShareCaptureEngineStop, RunsClosuresThatWereTakenBefore) {
    CEngineBench<> bench;
    CGate gate;
    CTally inside;
    bench.sink.SetFrameHook([&](IShareFrame*) {
        inside.Add();
        EXPECT_TRUE(gate.Passes());
    });
    bench.Start();
    bench.Advance(200);
    ASSERT_TRUE(inside.Reaches(1));
    EXPECT_EQ(bench.engine->SetCaptureFps(7), 0);
    EXPECT_EQ(bench.engine->SetCaptureFps(8), 0);
    {
        const CCallOnThread stop([&] { EXPECT_EQ(bench.engine->Stop(), 0); });
        stop.UntilItWaits();
        gate.Open();
    }
    EXPECT_EQ(bench.calls.Count("SetFPS 7"), 1u);
    EXPECT_EQ(bench.calls.Count("SetFPS 8"), 1u);
}

TEST(ShareCaptureEngineStop, IsNotHeldUpByACallbackThatStartsTheEngine) {
    CEngineBench<> bench;
    int result = 7;
    bench.sink.SetNoticeHook([&](const std::string& text) {
        if (text == "status 2")
            result = bench.engine->Start();
    });
    bench.Start();
    {
        const CCallOnThread stop([&] { EXPECT_EQ(bench.engine->Stop(), 0); });
    }
    EXPECT_EQ(result, -1) << "an engine that is stopping cannot be started from inside its own callback";
    EXPECT_EQ(bench.engine->GetCaptureStatus(), SHARE_CAPTURE_ENGINE_STATUS_STOPPED);
    EXPECT_TRUE(bench.trace.Contains(
        Error("[CShareCaptureEngine::_LockLifecycle]>>fail>>engine is starting or stopping")));
    bench.sink.SetNoticeHook(nullptr);
}

TEST(ShareCaptureEngineStop, IsNotHeldUpByACapturerThatStartsTheEngineFromAControlOperation) {
    CEngineBench<> bench;
    CGate gate;
    CTally inside;
    bench.sink.SetFrameHook([&](IShareFrame*) {
        inside.Add();
        EXPECT_TRUE(gate.Passes());
    });
    bench.capturer.SetFpsHook([&] {
        bench.engine->Start();
        bench.engine->SetExternalIShareCapturer(nullptr);
    });
    bench.Start();
    bench.Advance(200);
    ASSERT_TRUE(inside.Reaches(1));
    EXPECT_EQ(bench.engine->SetCaptureFps(7), 0); // waits behind the pass
    {
        const CCallOnThread stop([&] { EXPECT_EQ(bench.engine->Stop(), 0); });
        stop.UntilItWaits();
        gate.Open();
    }
    EXPECT_EQ(bench.engine->m_pIShareCapturerExternal, &bench.capturer);
    EXPECT_EQ(bench.engine->GetCaptureStatus(), SHARE_CAPTURE_ENGINE_STATUS_STOPPED);
}

namespace {

/// Stops an engine from inside the trace of an error that is being told, once it is let.
struct StoppingReceiver {
    IShareCaptureEngine* engine;
    CTally inside;
    CGate gate;

    static void Receive(void* context, int, const char*, const char* text, int) {
        auto& self = *static_cast<StoppingReceiver*>(context);
        if (std::string(text).find("OnCaptureError, nErrorCode=") == std::string::npos)
            return;
        self.inside.Add();
        EXPECT_TRUE(self.gate.Passes());
        self.engine->Stop();
    }
};

} // namespace

TEST(ShareCaptureEngineStop, IsNotHeldUpByATraceReceiverThatStopsTheEngine) {
    CEngineBench<> bench;
    bench.Start();
    bench.SettleEvents();
    StoppingReceiver receiver{bench.engine, {}, {}};
    CmSetTraceReceiver(StoppingReceiver::Receive, &receiver);
    bench.engine->OnCaptureError(-204); // traced on the assist thread, outside the sink's callback
    ASSERT_TRUE(receiver.inside.Reaches(1));
    {
        const CCallOnThread stop([&] { EXPECT_EQ(bench.engine->Stop(), 0); });
        stop.UntilItWaits();
        receiver.gate.Open();
    }
    CmSetTraceReceiver(nullptr, nullptr);
    EXPECT_EQ(bench.engine->GetCaptureStatus(), SHARE_CAPTURE_ENGINE_STATUS_STOPPED);
}

TEST(ShareCaptureEngineSetSink, ToNoneReturnsOnlyAfterARunningCallback) {
    CEngineBench<> bench;
    CGate gate;
    CTally inside;
    std::atomic<bool> over{false};
    bench.sink.SetFrameHook([&](IShareFrame*) {
        inside.Add();
        EXPECT_TRUE(gate.Passes());
        over = true;
    });
    bench.Start();
    bench.Advance(200);
    ASSERT_TRUE(inside.Reaches(1));
    {
        const CCallOnThread take([&] {
            EXPECT_EQ(bench.engine->SetSink(nullptr), 0);
            EXPECT_TRUE(over);
        });
        take.UntilItWaits();
        EXPECT_FALSE(take.HasReturned());
        gate.Open();
    }
    bench.Tick(2);
    EXPECT_EQ(bench.sink.FrameCount(), 1u);
}
