// SPDX-License-Identifier: Apache-2.0
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <functional>
#include <sstream>
#include <stdexcept>
#include <string>
#include <vector>

/// The errors that a pass could have at every tick: the first one of a run in full, then each site thinned
/// out.

namespace {

using Lines = std::vector<std::string>;

const std::string PASS = "src/share_capture_engine_pass";
const std::string IPC = "src/share_capture_engine_ipc";

std::string Hex(const void* pointer) {
    std::ostringstream text;
    text << "0x" << std::hex << reinterpret_cast<std::uintptr_t>(pointer);
    return text.str();
}

/// The first error after a start comes in full; the site's own counter then lets 1, 101 and 201 through.
template <class Bench>
void ExpectThinnedOut(Bench& bench, const std::string& message, const std::function<void()>& fail,
                      const std::string& path = PASS) {
    bench.engine->m_bFirstError = true;
    fail();
    Lines lines = bench.trace.LinesContaining(message);
    ASSERT_EQ(lines.size(), 1u);
    EXPECT_TRUE(IsLineAt(lines[0], Error(message), path));
    EXPECT_FALSE(bench.engine->m_bFirstError);

    bench.trace.Clear();
    for (int occurrence = 1; occurrence <= 201; ++occurrence) {
        fail();
        const std::size_t expected = 1u + static_cast<std::size_t>(occurrence - 1) / 100;
        ASSERT_EQ(bench.trace.CountContaining(message), expected) << "occurrence " << occurrence;
    }
    lines = bench.trace.LinesContaining(message);
    EXPECT_TRUE(AreAllAt(lines, ThinnedError(message), path));
    for (const CTraceLog::Entry& entry : bench.trace.Entries()) {
        if (entry.level == CM_TRACE_ERROR) {
            EXPECT_EQ(entry.tag, std::nullopt);
        }
    }
}

class ShareCaptureEngineErrors : public testing::Test {
protected:
    void SetUp() override {
        if (!IsOnlyTestOfProcess())
            GTEST_SKIP() << "sites count for the life of a process, and this is not its only test";
    }
};

} // namespace

TEST_F(ShareCaptureEngineErrors, TellOfAPassThatIsNotOnTheWorker) {
    CEngineBench<> bench;
    bench.Start();
    ExpectThinnedOut(
        bench, "[CShareCaptureEngine::_CaptureProcess] _CaptureProcess just is called by Capturer thread",
        [&] { bench.Pass(); });
    EXPECT_TRUE(bench.calls.CountStarting("SetCaptureMaxSize") == 0) << "the pass went on";
}

TEST_F(ShareCaptureEngineErrors, TellOfAPassWhileTheEngineIsPaused) {
    CEngineBench<> bench;
    bench.BeginInline();
    EXPECT_EQ(bench.engine->Pause(), 0);
    bench.Forget();
    ExpectThinnedOut(bench,
                     "[CShareCaptureEngine::_CaptureProcess]m_eSHARE_CAPTURE_ENGINE_STATUS!="
                     "SHARE_CAPTURE_ENGINE_STATUS_STARTED",
                     [&] { bench.Pass(); });
    EXPECT_TRUE(bench.calls.Calls().empty());
    EXPECT_EQ(bench.sink.FrameCount(), 0u);
}

TEST_F(ShareCaptureEngineErrors, TellOfAPassWithoutASink) {
    CEngineBench<> bench;
    bench.BeginInline();
    EXPECT_EQ(bench.engine->SetSink(nullptr), 0);
    bench.Forget();
    ExpectThinnedOut(bench, "[CShareCaptureEngine::_CaptureProcess]m_pIShareCaptureEngineSink==TVLNull",
                     [&] { bench.Pass(); });
    EXPECT_TRUE(bench.calls.Calls().empty());
}

TEST_F(ShareCaptureEngineErrors, TellOfAPassWithoutAFrame) {
    CEngineBench<> bench;
    bench.BeginInline();
    bench.engine->m_pCurShareFrame = nullptr;
    ExpectThinnedOut(bench, "[CShareCaptureEngine::_CaptureProcess]>>pIShareFrame=0x0",
                     [&] { bench.Pass(); });
    EXPECT_TRUE(bench.calls.Calls().empty());
    EXPECT_EQ(bench.engine->m_tickFpsStart, 0u);
}

TEST_F(ShareCaptureEngineErrors, TellOfAPassWithoutACapturer) {
    CEngineBench<> bench(true);
    bench.BeginInline();
    bench.engine->m_pIShareCapturerExternal = nullptr;
    ExpectThinnedOut(bench,
                     "[CShareCaptureEngine::_CaptureProcess]>>pIShareFrame=" +
                         Hex(bench.engine->m_pCurShareFrame) + ">>pIShareCapturer=0x0",
                     [&] { bench.Pass(3); });
    EXPECT_TRUE(bench.calls.Calls().empty()) << "the pass went on to the pointer";
    EXPECT_EQ(bench.engine->m_tickFpsStart, 0u) << "the pass went on to the frame rate";
    EXPECT_EQ(bench.trace.CountContaining("Fail Capture"), 0u);
}

TEST_F(ShareCaptureEngineErrors, TellOfFailedCapturesWithTheResultUnsigned) {
    CEngineBench<> bench;
    bench.BeginInline();
    bench.capturer.SetResult(-1);
    ExpectThinnedOut(bench, "[CShareCaptureEngine::_CaptureProcess]>>Fail Capture Content, ret=4294967295",
                     [&] { bench.Pass(); });
}

TEST_F(ShareCaptureEngineErrors, TellOfMissingPointers) {
    CEngineBench<> bench;
    bench.BeginInline();
    bench.engine->GivePointing(nullptr);
    ExpectThinnedOut(bench, "[CShareCaptureEngine::_CaptureProcess]>>Fail Capture Cursor,",
                     [&] { bench.Pass(3); });
    EXPECT_EQ(bench.sink.FrameCount(), 202u) << "a missing pointer cost more than a line";
}

TEST_F(ShareCaptureEngineErrors, TellOfSinksThatVanishDuringThePass) {
    CEngineBench<> bench;
    bench.BeginInline();
    bench.capturer.SetHook([&](IShareFrame*) { bench.engine->m_sinkPort->SetSink(nullptr); });
    ExpectThinnedOut(bench, "[CShareCaptureEngine::_UpdateShareData]>>m_pIShareCaptureEngineSink=NULL", [&] {
        bench.engine->m_sinkPort->SetSink(&bench.sink);
        bench.Pass();
    });
    EXPECT_EQ(bench.sink.FrameCount(), 0u);
    EXPECT_EQ(bench.Statistic().nTotalFrames, 202) << "the frame counts all the same";
}

TEST_F(ShareCaptureEngineErrors, TellOfCapturersThatThrow) {
    CEngineBench<> bench;
    bench.BeginInline();
    bench.capturer.SetHook([](IShareFrame*) { throw std::runtime_error("no camera"); });
    ExpectThinnedOut(bench, "[CShareCaptureEngine::_CaptureProcess]>>Capture threw no camera",
                     [&] { bench.Pass(); });
}

TEST_F(ShareCaptureEngineErrors, TellOfAPassInAnotherProcessWithoutAFrame) {
    CEngineBench<CIpcEngine> bench;
    bench.BeginInline();
    bench.engine->m_pCurShareFrame = nullptr;
    ExpectThinnedOut(
        bench, "[CShareCaptureEngine::_IpcCaptureProcess]>>pIShareFrame=0x0", [&] { bench.Pass(); }, IPC);
}

TEST_F(ShareCaptureEngineErrors, TellOfAPassInAnotherProcessWithoutACapturer) {
    CEngineBench<CIpcEngine> bench;
    bench.BeginInline();
    bench.engine->m_pIShareCapturerExternal = nullptr;
    ExpectThinnedOut(
        bench,
        "[CShareCaptureEngine::_IpcCaptureProcess]>>pIShareFrame=" + Hex(bench.engine->m_pCurShareFrame) +
            ">>pIShareCapturer=0x0",
        [&] { bench.Pass(); }, IPC);
}
