// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/share_capture_engine_kinds.h"
#include "tests/support/call_log.h"
#include "tests/support/engine_probe.h"
#include "tests/support/fake_capturer.h"
#include "tests/support/fake_pointing.h"
#include "tests/support/recording_sink.h"
#include "tests/support/threads.h"
#include "tests/support/trace_log.h"

#include <screenshare/share_engine.h>

#include <gtest/gtest.h>

#include <chrono>
#include <cstddef>
#include <memory>
#include <string>
#include <type_traits>
#include <vector>

/// A capturer that the test keeps, as an engine holds one of its own.
std::shared_ptr<IShareCapturer> Borrow(IShareCapturer& capturer);

/// An engine with fakes all around it, on a clock that stands still until it is moved.
///
/// It can be driven in two ways. BeginInline, then Pass: every pass runs on the test's own thread, without a
/// worker. Or Start, then Tick: the clock is moved by one period, and Tick comes back when the worker has run
/// its pass.
template <class Engine = CShareCaptureEngine>
class CEngineBench {
public:
    /// `withPointing` gives the engine a pointing object that answers; by default it has what the library
    /// makes.
    explicit CEngineBench(bool withPointing = false) : engine(new CEngineProbe<Engine>) {
        if constexpr (std::is_base_of_v<CShareCaptureOwnCapturerEngine, Engine>)
            engine->GiveOwnCapturer(Borrow(capturer));
        else
            EXPECT_EQ(engine->SetExternalIShareCapturer(&capturer), 0);
        if (withPointing) {
            pointing = new CFakePointing(calls);
            engine->GivePointing(pointing);
            pointing->AddSink(engine);
        }
        Forget();
    }
    ~CEngineBench() {
        if (engine != nullptr) {
            EXPECT_EQ(DestroyShareCaptureEngine(engine), 0);
        }
    }
    CEngineBench(const CEngineBench&) = delete;
    CEngineBench& operator=(const CEngineBench&) = delete;

    /// Forgets what was traced, called and told so far.
    void Forget() {
        calls.Clear();
        trace.Clear();
        sink.Clear();
    }

    /// Makes the engine believe that it is started, with the sink in place and no worker.
    void BeginInline() {
        EXPECT_EQ(engine->SetSink(&sink), 0);
        engine->m_eSHARE_CAPTURE_ENGINE_STATUS = SHARE_CAPTURE_ENGINE_STATUS_STARTED;
        Forget();
    }
    void Pass(unsigned mask = SHARE_CAPTURE_MASK_CONTENT) { engine->_CaptureProcess(mask); }
    void Passes(int count, unsigned mask = SHARE_CAPTURE_MASK_CONTENT) {
        for (int i = 0; i < count; ++i)
            Pass(mask);
    }

    /// Moves the clock. A worker that is running takes its ticks from it.
    void Advance(int milliseconds) { clock->Advance(std::chrono::milliseconds(milliseconds)); }

    /// Starts the engine for real, with the sink in place.
    void Start() {
        EXPECT_EQ(engine->SetSink(&sink), 0);
        ASSERT_EQ(engine->Start(), 0);
    }
    /// Periods of 200 ms, the rate of an engine that nobody has told another.
    void Tick(int count = 1) {
        for (int i = 0; i < count; ++i) {
            Advance(200);
            Settle(*engine->_GetWorker());
        }
    }
    /// Comes back when the events posted to the sink so far have been told.
    void SettleEvents() { Settle(*engine->_GetAssistThread()); }

    SHARE_CAPTURE_STATISTIC Statistic() {
        SHARE_CAPTURE_STATISTIC statistic{};
        EXPECT_EQ(engine->GetShareCaptureStatistic(statistic), 0);
        return statistic;
    }

    CManualClockScope clock;
    CTraceLog trace;
    CCallLog calls;
    CFakeCapturer capturer{calls};
    CRecordingSink sink{calls};
    CEngineProbe<Engine>* engine; // null once the test has destroyed it
    CFakePointing* pointing = nullptr;
};

// Lines of the library, as they are before the source place.
std::string Detail(const std::string& message);
std::string Debug(const std::string& message);
std::string Info(const std::string& message);
std::string Warning(const std::string& message);
std::string Error(const std::string& message);
std::string ThinnedWarning(const std::string& message);
std::string ThinnedError(const std::string& message);

/// The lines without the source places of those that have one.
std::vector<std::string> WithoutSourcePlaces(std::vector<std::string> lines);

/// The places of lines of one message on a hot path: the file and nothing about the line.
testing::AssertionResult AreAllAt(const std::vector<std::string>& lines, const std::string& text,
                                  const std::string& path);

/// Repeated messages are counted by site for the life of the process, so a test that looks at the count has
/// to be alone in its process, as it is under CTest.
bool IsOnlyTestOfProcess();

/// The threads of the process while no engine runs. Starts one first and waits for its end, since some
/// sanitizers bring a thread of their own along with the first.
std::ptrdiff_t CountThreadsAtRest();

using CNoRoomForThreads = CNoNewThreadsScope;
