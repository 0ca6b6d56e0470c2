// SPDX-License-Identifier: Apache-2.0
#include "src/app_share_config.h"
#include "src/share_capturer_dummy.h"
#include "src/share_pointing_mouse.h"
#include "src/share_ref.h"
#include "src/share_source.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <cstddef>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <mutex>
#include <string>
#include <type_traits>
#include <vector>

// Engines on dummies that a debug file asks for: the whole way from the file to the sink, without a window
// server. Settings are one a process, so each test counts on a process and a debug folder of its own.

namespace {

namespace fs = std::filesystem;

using Lines = std::vector<std::string>;
using Rows = std::vector<int>;

constexpr int WIDTH = 16;
constexpr int HEIGHT = 9;
constexpr unsigned SHARED_ID = 3;

/// The black row of a dummy's picture; -1 when there is none, or when any other row isn't white.
int BlackRowOf(IShareFrame* frame) {
    TVLSize size{};
    frame->GetFrameSize(size);
    int found = -1;
    for (int row = 0; row < size.cy; ++row) {
        const unsigned char* const line = frame->GetFrameLineData(row);
        const auto whole = [&](unsigned char value) {
            return std::all_of(line, line + size.cx * 4,
                               [value](unsigned char byte) { return byte == value; });
        };
        if (whole(0) && found == -1)
            found = row;
        else if (!whole(255))
            return -1;
    }
    return found;
}

class EnginesOnDummies : public testing::Test {
protected:
    void SetUp() override {
        const char* const folder = std::getenv("SCREENSHARE_DEBUG_DIR");
        if (folder == nullptr || !IsOnlyTestOfProcess())
            GTEST_SKIP() << "needs a process and a debug folder of its own: run it through CTest";
        m_file = fs::path(folder) / "share_config.json";
        WriteFile(R"("dummy_capture": true, "dummy_capture_width": 16, "dummy_capture_height": 9)");
    }

    void WriteFile(const std::string& settings) {
        std::ofstream(m_file, std::ios::binary) << "{" << settings << "}";
        fs::permissions(m_file, fs::perms::owner_read | fs::perms::owner_write);
    }

    fs::path m_file;
};

/// An engine of a kind as the library makes it, with something of its kind to share, on a clock that stands
/// still.
template <class Engine>
class CDummyRun {
public:
    CDummyRun() {
        sink.SetFrameHook([this](IShareFrame* frame) {
            const std::lock_guard<std::mutex> lock(m_mutex);
            m_rows.push_back(BlackRowOf(frame));
        });
    }
    ~CDummyRun() { EXPECT_EQ(DestroyShareCaptureEngine(engine), 0); }
    CDummyRun(const CDummyRun&) = delete;
    CDummyRun& operator=(const CDummyRun&) = delete;

    void Share() {
        if constexpr (std::is_same_v<Engine, CShareCaptureWindowEngine>) {
            EXPECT_EQ(engine->AddSharedWindow(SHARED_ID), 0);
        } else {
            ShareSourceInfo info;
            info.sourceId = SHARED_ID;
            info.eType = std::is_same_v<Engine, CShareCaptureAppEngine> ? SHARE_SOURCE_TYPE_APP
                                                                        : SHARE_SOURCE_TYPE_MONITOR;
            const ShareRef<IShareSource> source(new CShareSource);
            source.Get()->SetInfo(&info);
            EXPECT_EQ(engine->AddCaptureShareSource(source.Get()), 0);
        }
    }

    void Start(unsigned fps) {
        m_period = std::chrono::microseconds(1000000 / fps);
        Share();
        EXPECT_EQ(engine->SetCaptureFps(fps), -5) << "the capturer has no rate of its own";
        EXPECT_EQ(engine->SetSink(&sink), 0);
        ASSERT_EQ(engine->Start(), 0);
    }

    void Advance(std::chrono::nanoseconds step) {
        clock->Advance(step);
        Settle(*engine->_GetWorker());
    }
    void Tick(int count = 1) {
        for (int i = 0; i < count; ++i)
            Advance(m_period);
    }

    /// The black rows of the frames so far.
    Rows DeliveredRows() const {
        const std::lock_guard<std::mutex> lock(m_mutex);
        return m_rows;
    }

    CManualClockScope clock;
    CTraceLog trace;
    CCallLog calls;
    CRecordingSink sink{calls};
    CEngineProbe<Engine>* const engine = new CEngineProbe<Engine>;

private:
    std::chrono::nanoseconds m_period{0};
    mutable std::mutex m_mutex;
    Rows m_rows; // guarded by m_mutex
};

Rows RowsOfFrames(int count) {
    Rows rows;
    for (int frame = 1; frame <= count; ++frame)
        rows.push_back(frame % HEIGHT);
    return rows;
}

/// Two seconds at a rate: each frame has the line at the row that its count says.
template <class Engine>
void ExpectMovingLineAt(unsigned fps) {
    SCOPED_TRACE(std::to_string(fps) + " fps");
    CDummyRun<Engine> run;
    run.Start(fps);
    const int frames = static_cast<int>(2 * fps);
    run.Advance(std::chrono::microseconds(1000000 / fps) - std::chrono::nanoseconds(1));
    EXPECT_EQ(run.sink.FrameCount(), 0u) << "a frame before its time";
    run.Advance(std::chrono::nanoseconds(1));
    run.Tick(frames - 1);
    EXPECT_EQ(run.DeliveredRows(), RowsOfFrames(frames));
    for (const CRecordingSink::Frame& frame : run.sink.Frames()) {
        EXPECT_EQ(frame.size, (TVLSize{WIDTH, HEIGHT}));
        EXPECT_EQ(frame.update, (TVLRect{0, 0, WIDTH, HEIGHT}));
    }
    SHARE_CAPTURE_STATISTIC statistic{};
    run.engine->GetShareCaptureStatistic(statistic);
    EXPECT_EQ(statistic.nTotalFrames, frames);
    EXPECT_EQ(statistic.nDuplicateFrames, 0);
    EXPECT_EQ(run.engine->Stop(), 0);
    EXPECT_TRUE(run.sink.WaitForNotice("status 2"));
    run.clock->Advance(std::chrono::seconds(1));
    EXPECT_EQ(run.sink.FrameCount(), static_cast<std::size_t>(frames)) << "a frame after the end";
}

template <class Engine>
void ExpectMovingLine() {
    for (const unsigned fps : {5u, 30u, 60u})
        ExpectMovingLineAt<Engine>(fps);
}

} // namespace

TEST_F(EnginesOnDummies, ShareADesktopWithTheLineWhereTheFramesCountSays) {
    ExpectMovingLine<CShareCaptureDesktopEngine>();
}

TEST_F(EnginesOnDummies, ShareAnApplicationWithTheLineWhereTheFramesCountSays) {
    ExpectMovingLine<CShareCaptureAppEngine>();
}

TEST_F(EnginesOnDummies, ShareAWindowWithTheLineWhereTheFramesCountSays) {
    ExpectMovingLine<CShareCaptureWindowEngine>();
}

TEST_F(EnginesOnDummies, AreMadeByTheExportedFunctionFromTheFirstEngineOn) {
    const CManualClockScope clock;
    for (const int type : {2, 3, 4}) {
        IShareCaptureEngine* const engine =
            CreateShareCaptureEngine(static_cast<SHARE_CAPTURE_ENGINE_TYPE>(type));
        ASSERT_NE(engine, nullptr);
        EXPECT_EQ(engine->AddSharedWindow(SHARED_ID), 0) << "there is a capturer to take it";
        EXPECT_EQ(DestroyShareCaptureEngine(engine), 0);
    }
}

TEST_F(EnginesOnDummies, HoldBackNoFrameAsADuplicate) {
    CDummyRun<CShareCaptureDesktopEngine> run;
    bool on = true;
    EXPECT_EQ(run.engine->Config(SHARE_CAPTURE_ENGINE_CONFIG_CHECK_DUP_FRAME, &on, sizeof on), 0);
    run.Start(10);
    run.Tick(2 * HEIGHT);
    EXPECT_EQ(run.DeliveredRows(), RowsOfFrames(2 * HEIGHT));
}

TEST_F(EnginesOnDummies, StartOnASharedWindowAndAreRefusedWithout) {
    CDummyRun<CShareCaptureWindowEngine> run;
    ShareSourceInfo info;
    info.eType = SHARE_SOURCE_TYPE_MONITOR;
    const ShareRef<IShareSource> source(new CShareSource);
    source.Get()->SetInfo(&info);
    EXPECT_EQ(run.engine->AddCaptureShareSource(source.Get()), 0);
    EXPECT_EQ(run.engine->Start(), -6) << "a source that is no window";
    EXPECT_EQ(run.engine->AddSharedWindow(SHARED_ID), 0);
    EXPECT_EQ(run.engine->Start(), 0);
}

TEST_F(EnginesOnDummies, StartOnASharedApplicationAloneAndAreRefusedWithout) {
    CDummyRun<CShareCaptureAppEngine> run;
    EXPECT_EQ(run.engine->AddSharedProcess(SHARED_ID), -3) << "a dummy shares no processes";
    EXPECT_EQ(run.engine->Start(), -6);
    EXPECT_EQ(run.engine->m_spShareCapturerContext->AddSharedApp(SHARED_ID), 0);
    EXPECT_EQ(run.engine->Start(), 0);
}

TEST_F(EnginesOnDummies, NeedASourceToShareADesktop) {
    CDummyRun<CShareCaptureDesktopEngine> run;
    EXPECT_EQ(run.engine->SelectSharedDisplay(1), -3);
    EXPECT_EQ(run.engine->Start(), -6);
    run.Share();
    EXPECT_EQ(run.engine->GetCaptureShareSourceCount(), 1);
    EXPECT_EQ(run.engine->Start(), 0);
}

TEST_F(EnginesOnDummies, SayThatAnotherCaptureModeFailedAndGoOnWithANewDummy) {
    CDummyRun<CShareCaptureDesktopEngine> run;
    run.Start(10);
    run.Tick(3);
    EXPECT_EQ(run.engine->SetCaptureMode(SCREEN_CAPTURER_TYPE_AVFOUNDATION), 0);
    Settle(*run.engine->_GetWorker());
    run.Tick(2);
    EXPECT_EQ(run.DeliveredRows(), (Rows{1, 2, 3, 1, 2})) << "a new dummy begins at the top";
    EXPECT_EQ(
        run.trace.CountContaining("[CShareCaptureEngine::SetCaptureMode] failed >> recreate share capturer"),
        1u);
}

TEST_F(EnginesOnDummies, GoOnWithTheNewCapturerAfterAFallbackInsideAPass) {
    CEngineBench<CShareCaptureDesktopEngine> bench(true);
    bench.BeginInline();
    bench.engine->SetCaptureMode(SCREEN_CAPTURER_TYPE_AVFOUNDATION);
    bench.engine->GiveOwnCapturer(Borrow(bench.capturer));
    bench.capturer.SetResult(SHARE_CAPTURE_FATAL);
    bench.Forget();
    bench.Pass(SHARE_CAPTURE_MASK_CONTENT | SHARE_CAPTURE_MASK_POINTER);
    EXPECT_EQ(bench.calls.Count("Capture"), 1u);
    EXPECT_EQ(bench.calls.Count("GetScaleFactor"), 0u) << "the old one has been given up";
    EXPECT_EQ(bench.sink.FrameCount(), 0u);
    EXPECT_EQ(bench.engine->m_eCaptureMode, SCREEN_CAPTURER_TYPE_DEFAULT);
    EXPECT_NE(dynamic_cast<CShareCapturerDummy*>(bench.engine->_GetOwnCapturer().get()), nullptr);
    bench.Pass(SHARE_CAPTURE_MASK_CONTENT | SHARE_CAPTURE_MASK_POINTER);
    EXPECT_EQ(bench.calls.Count("Capture"), 1u);
    EXPECT_EQ(bench.calls.Count("CapturePoint"), 1u) << "the new one has no pointer in its picture";
    ASSERT_EQ(bench.sink.FrameCount(), 1u);
    EXPECT_EQ(bench.sink.Frames()[0].size, (TVLSize{WIDTH, HEIGHT}));
}

// ---- The dummy pointer

TEST_F(EnginesOnDummies, DeliverFramesThoughTheirPointerIsNotComposed) {
    WriteFile(
        R"("dummy_capture": true, "dummy_point": true, "dummy_capture_width": 16, "dummy_capture_height": 9)");
    AppShareConfig::Instance()->InitConfig();
    CDummyRun<CShareCaptureDesktopEngine> run;
    ASSERT_NE(run.engine->m_pISharePointing, nullptr);
    EXPECT_TRUE(run.trace.Contains(Debug("CreateSharePointing() create dummy object ")));
    run.Start(10);
    run.Tick(5);
    EXPECT_EQ(run.DeliveredRows(), RowsOfFrames(5));
    const Lines errors = run.trace.LinesContaining("ERROR");
    ASSERT_GE(errors.size(), 1u);
    EXPECT_TRUE(IsLineAt(errors[0], Error("[CShareCaptureEngine::_CaptureProcess]>>Fail Capture Cursor,"),
                         "src/share_capture_engine_pass"));
    EXPECT_FALSE(run.sink.Frames()[0].pointerCaptured);
}

TEST_F(EnginesOnDummies, IgnoreTheFileForTheFirstPointerAndObeyItForTheNext) {
    WriteFile(R"("dummy_point": true)");
    const CEngineProbe<CShareCaptureEngine> first;
    const auto isDummy = [](ISharePointing* pointing) {
        return dynamic_cast<CSharePointingMouseDummy*>(pointing) != nullptr;
    };
    EXPECT_FALSE(isDummy(first.m_pISharePointing)) << "made before the file was read";
    const CEngineProbe<CShareCaptureEngine> second;
    EXPECT_TRUE(isDummy(second.m_pISharePointing));
}

// ---- The debug file while engines come and run

TEST_F(EnginesOnDummies, ReadTheFileWhenTheyAreMadeAndPutTheCaptureModeBack) {
    WriteFile(R"("dummy_capture_width": 320, "screen_capturer_type": 8)");
    AppShareConfig& config = *AppShareConfig::Instance();
    EXPECT_EQ(config.m_nDummyCaptureWidth, 1024);
    const CEngineProbe<CShareCaptureEngine> engine;
    EXPECT_EQ(config.m_nDummyCaptureWidth, 320);
    EXPECT_EQ(config.GetScreenCapturerType(), SCREEN_CAPTURER_TYPE_DEFAULT);
    EXPECT_EQ(engine.m_eCaptureMode, SCREEN_CAPTURER_TYPE_DEFAULT);
}

TEST_F(EnginesOnDummies, TakeNewDumpAndTraceSettingsWhileTheyRun) {
    CDummyRun<CShareCaptureDesktopEngine> run;
    run.Start(10);
    run.Tick(4);
    WriteFile(R"("trace_one_by_frames": 2, "dump_raw_data_every_x_frames": 3, "dump_point_raw_data": true)");
    run.trace.Clear();
    run.Advance(std::chrono::seconds(61));
    run.Tick(5); // frames 5 to 10 with the one of the long tick
    const AppShareConfig& config = *AppShareConfig::Instance();
    EXPECT_EQ(config.m_nDumpDataEveryFrames, 3);
    EXPECT_TRUE(config.m_bDumpPointRawData);
    const Lines lines = run.trace.LinesContaining("TotalFrames=");
    ASSERT_EQ(lines.size(), 3u);
    for (int i = 0; i < 3; ++i)
        EXPECT_NE(lines[static_cast<std::size_t>(i)].find("TotalFrames=" + std::to_string(6 + 2 * i) + " "),
                  std::string::npos);
}
