// SPDX-License-Identifier: Apache-2.0
#include "src/app_share_config.h"
#include "tests/support/engine_bench.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <stdexcept>
#include <string>
#include <vector>

/// The order of a pass, its checks, its errors and its delivery.

namespace {

using Lines = std::vector<std::string>;

const std::string PASS = "src/share_capture_engine_pass";

} // namespace

TEST(ShareCaptureEnginePass, AsksCapturerPointerAndSinkInThatOrder) {
    CEngineBench<> bench(true);
    auto* const image = new CFakePointingImg(bench.calls, nullptr, 0, 0);
    image->AddRef();
    bench.pointing->image = image;
    bench.engine->m_spShareCapturerContext->m_bNoWindowBaseArea = false;
    bench.BeginInline();
    bench.Pass(3);
    EXPECT_EQ(bench.calls.Calls(),
              (Lines{"SetCaptureMaxSize 2880x1800", "Capture", "PointerCaptured", "GetScaleFactor",
                     "CapturePoint", "GetImgData", "IsWindowAreaBaseContentSupport", "OnCaptureData"}));
    image->Release();
}

TEST(ShareCaptureEnginePass, IsNoneForATickWithoutAnEngine) {
    const CTraceLog trace;
    EXPECT_EQ(CShareCaptureEngine::ThreadRun(nullptr), 0u);
    EXPECT_EQ(trace.Lines(), Lines{});
}

TEST(ShareCaptureEnginePass, TracesAFirstFrameInItsOrder) {
    CEngineBench<> bench;
    bench.BeginInline();
    bench.Pass();
    EXPECT_EQ(
        bench.trace.Lines(),
        (Lines{Info("[CShareCaptureEngine::_CaptureProcess]>>new capture size w=8,h=4,[Checkpoint]"),
               Info("[CShareCaptureEngine::_CaptureProcess]>>Capture first Frame w=8,h=4,[Checkpoint]")}));
}

TEST(ShareCaptureEnginePass, TicksOnAPausedEngineAndDeliversNothing) {
    CEngineBench<> bench;
    bench.Start();
    EXPECT_EQ(bench.engine->Pause(), 0);
    bench.Tick(5);
    EXPECT_EQ(bench.calls.CountStarting("SetCaptureMaxSize"), 0u);
    EXPECT_EQ(bench.sink.FrameCount(), 0u);
    // In full for the first error of all, and thinned out for the first one of the site.
    EXPECT_LE(bench.trace.CountContaining("!=SHARE_CAPTURE_ENGINE_STATUS_STARTED"), 2u);
    EXPECT_GE(bench.trace.CountContaining("!=SHARE_CAPTURE_ENGINE_STATUS_STARTED"), 1u);
    EXPECT_EQ(bench.engine->Resume(), 0);
    bench.Tick();
    EXPECT_EQ(bench.sink.FrameCount(), 1u);
}

TEST(ShareCaptureEnginePass, WritesOnlyTheVeryFirstErrorInFullWhateverItsKind) {
    CEngineBench<> bench;
    bench.BeginInline();
    bench.engine->GivePointing(nullptr);
    bench.Forget();
    bench.Pass(3); // no pointer
    bench.capturer.SetResult(-1);
    bench.Pass(1); // no content
    const Lines lines = bench.trace.LinesContaining("ERROR: ");
    ASSERT_GE(lines.size(), 1u);
    EXPECT_TRUE(
        IsLineAt(lines[0], Error("[CShareCaptureEngine::_CaptureProcess]>>Fail Capture Cursor,"), PASS));
    for (std::size_t i = 1; i < lines.size(); ++i)
        EXPECT_EQ(lines[i].find("[UTIL] ERROR: "), 0u);
}

TEST(ShareCaptureEnginePass, GivesTheFrameItsTimeUnlessTheCapturerDid) {
    CEngineBench<> bench;
    bench.BeginInline();
    bench.Advance(1234);
    bench.Pass();
    // The clock began at one hour.
    EXPECT_EQ(bench.sink.Frames().back().timestamp, 3601234u);
    bench.capturer.Change([](CFakeCapturer::Answers& answers) { answers.timestamp = 77; });
    bench.Pass();
    EXPECT_EQ(bench.sink.Frames().back().timestamp, 77u);
}

TEST(ShareCaptureEnginePass, DeliversTheWholeFrameAsUpdateRectangle) {
    CEngineBench<> bench;
    bench.BeginInline();
    bench.capturer.Change([](CFakeCapturer::Answers& answers) { answers.size = {31, 17}; });
    bench.Pass();
    EXPECT_EQ(bench.sink.Frames().back().update, (TVLRect{0, 0, 31, 17}));
    EXPECT_EQ(bench.sink.Frames().back().size, (TVLSize{31, 17}));
}

TEST(ShareCaptureEnginePass, TakesNoReferenceOnAFrameForTheSink) {
    CEngineBench<> bench;
    unsigned references = 0;
    bench.sink.SetFrameHook([&](IShareFrame* frame) { references = frame->GetReference(); });
    bench.BeginInline();
    bench.Pass();
    EXPECT_EQ(references, 1u);
}

TEST(ShareCaptureEnginePass, IsOverForASinkThatThrowsAndTheNextOneIsWhole) {
    CEngineBench<> bench;
    bench.sink.SetFrameHook([](IShareFrame*) { throw std::runtime_error("sink"); });
    bench.Start();
    bench.Tick();
    EXPECT_EQ(bench.trace.CountContaining("exception from a tick: sink"), 1u);
    bench.sink.SetFrameHook(nullptr);
    bench.Tick();
    EXPECT_EQ(bench.sink.FrameCount(), 2u);
    EXPECT_EQ(bench.engine->Stop(), 0) << "the engine believes that a callback is still running";
}

namespace {

/// The names used up by the passes: one for each round of dumping.
int DumpRounds(CEngineBench<>& bench, int passes) {
    AppShareConfig& config = *AppShareConfig::Instance();
    const auto number = [&] {
        const std::string name = config.GetCaptureDumpPathNamePrefix();
        return std::stoi(name.substr(name.rfind('/') + 1));
    };
    const int before = number();
    bench.Passes(passes, 3);
    return number() - before - 1;
}

class ShareCaptureEngineDumpRounds : public testing::Test {
protected:
    ~ShareCaptureEngineDumpRounds() override {
        config.m_bCaptureDumpData = false;
        config.m_bDumpPointRawData = false;
        config.m_nDumpDataEveryFrames = 10;
    }

    AppShareConfig& config = *AppShareConfig::Instance();
    CEngineBench<> bench;
};

} // namespace

TEST_F(ShareCaptureEngineDumpRounds, DoNotComeWhileNothingIsToBeSaved) {
    bench.BeginInline();
    EXPECT_EQ(DumpRounds(bench, 25), 0);
}

TEST_F(ShareCaptureEngineDumpRounds, ComeWithEachTenthDeliveredFrame) {
    config.m_bCaptureDumpData = true;
    bench.BeginInline();
    EXPECT_EQ(DumpRounds(bench, 21), 3);
}

TEST_F(ShareCaptureEngineDumpRounds, ComeForThePointerAlone) {
    config.m_bDumpPointRawData = true;
    bench.BeginInline();
    EXPECT_EQ(DumpRounds(bench, 11), 2);
}

TEST_F(ShareCaptureEngineDumpRounds, ComeWithEveryPassWhileNoFrameIsDelivered) {
    config.m_bCaptureDumpData = true;
    bench.BeginInline();
    bench.capturer.SetResult(-1);
    EXPECT_EQ(DumpRounds(bench, 5), 5);
}

TEST_F(ShareCaptureEngineDumpRounds, ComeWithEveryFrameForAnEveryOfZeroOrLess) {
    config.m_bCaptureDumpData = true;
    config.m_nDumpDataEveryFrames = 0;
    bench.BeginInline();
    EXPECT_EQ(DumpRounds(bench, 4), 4);
}
