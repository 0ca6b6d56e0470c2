// SPDX-License-Identifier: Apache-2.0
#include "src/share_capture_engine_pass.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <ostream>
#include <string>
#include <vector>

/// What becomes of the frame on each way through the pass, and what happens when there is none.

namespace {

using Lines = std::vector<std::string>;

enum class Sent {
    Nothing,
    Current,
    Previous
};

struct Fate {
    const char* name;
    // The pass: frames 1 and 2 were delivered before it, so the previous frame holds picture 2.
    int result;
    unsigned char picture;
    bool force;
    int millisecondsSinceLast;
    int millisecondsOfDuplicates; // 0 when none came before
    bool sizeRefused;
    // What comes of it.
    Sent sent;
    bool nextIntoOther;
    int frames;
    int duplicates;
    unsigned countedForRate;
    bool polledPointer;
    bool event;
};

std::ostream& operator<<(std::ostream& out, const Fate& fate) {
    return out << fate.name;
}

const Fate FATES[] = {
    {"a different picture", 0, 3, false, 200, 0, false, Sent::Current, true, 1, 0, 1, true, false},
    {"the first duplicate", 0, 2, false, 200, 0, false, Sent::Nothing, false, 0, 1, 1, true, false},
    {"a duplicate within the time", 0, 2, false, 200, 1000, false, Sent::Nothing, false, 0, 1, 1, true,
     false},
    {"a duplicate beyond the time", 0, 2, false, 200, 1001, false, Sent::Current, true, 1, 1, 1, true, false},
    {"a forced duplicate", 0, 2, true, 200, 0, false, Sent::Current, true, 1, 0, 1, true, false},
    {"no data, a resend not due", -302, 0, false, 1000, 0, false, Sent::Nothing, false, 0, 0, 0, false, true},
    {"no data, a resend due", -302, 0, false, 1001, 0, false, Sent::Previous, false, 1, 0, 1, false, false},
    {"a drag, a resend not due", -303, 0, false, 1000, 0, false, Sent::Nothing, false, 0, 0, 0, false, true},
    {"a drag, a resend due", -303, 0, false, 1001, 0, false, Sent::Previous, false, 1, 0, 1, false, false},
    {"a drag, a forced resend", -303, 0, true, 1, 0, false, Sent::Previous, false, 1, 0, 1, false, false},
    {"a failure", -1, 0, false, 5000, 0, false, Sent::Nothing, false, 0, 0, 0, false, false},
    {"no finished frame", -304, 0, true, 5000, 0, false, Sent::Nothing, false, 0, 0, 0, false, false},
    {"the display gone", -203, 0, false, 5000, 0, false, Sent::Nothing, false, 0, 0, 0, false, false},
    {"a fatal failure", -7, 0, true, 5000, 0, false, Sent::Nothing, false, 0, 0, 0, false, false},
    {"a refused size", 0, 3, false, 5000, 0, true, Sent::Nothing, false, 0, 0, 0, true, false},
};

class ShareFrameFate : public testing::TestWithParam<Fate> {
protected:
    ShareFrameFate() {
        bench.engine->m_bCheckDupFrame = true;
        bench.BeginInline();
        for (const int picture : {1, 2}) {
            bench.capturer.SetFill(static_cast<unsigned char>(picture));
            bench.Pass(3);
            bench.Advance(1);
        }
        EXPECT_EQ(bench.sink.FrameCount(), 2u);
    }

    void SetUpPass(const Fate& fate) {
        bench.capturer.SetResult(fate.result);
        bench.capturer.SetFill(fate.picture);
        bench.capturer.Change(
            [&](CFakeCapturer::Answers& answers) { answers.maxSizeResult = fate.sizeRefused ? -1 : 0; });
        bench.engine->m_bForceFrame = fate.force;
        bench.Advance(fate.millisecondsSinceLast - 1);
        const unsigned now = ShareTickNow();
        if (fate.millisecondsOfDuplicates != 0)
            bench.engine->m_tickDupStart = now - static_cast<unsigned>(fate.millisecondsOfDuplicates);
        bench.engine->m_tickFpsStart = now;
        bench.engine->m_nFpsFrames = 0;
        bench.SettleEvents();
        bench.Forget();
    }

    CEngineBench<> bench{true};
};

} // namespace

TEST_P(ShareFrameFate, IsAsTheRowSays) {
    const Fate& fate = GetParam();
    IShareFrame* const current = bench.engine->_GetCurShareFrame();
    IShareFrame* const previous = bench.engine->_GetPreShareFrame();
    SetUpPass(fate);
    const SHARE_CAPTURE_STATISTIC before = bench.Statistic();
    bench.Pass(3);
    bench.SettleEvents();

    const std::vector<CRecordingSink::Frame> sent = bench.sink.Frames();
    ASSERT_EQ(sent.size(), fate.sent == Sent::Nothing ? 0u : 1u);
    if (fate.sent != Sent::Nothing) {
        EXPECT_EQ(sent[0].frame, fate.sent == Sent::Current ? current : previous);
        EXPECT_EQ(sent[0].firstByte, fate.sent == Sent::Current ? fate.picture : 2);
        EXPECT_EQ(sent[0].timestamp, ShareTickNow()) << "it was sent with an old time";
    }
    EXPECT_EQ(bench.engine->_GetCurShareFrame(), fate.nextIntoOther ? previous : current);
    EXPECT_EQ(bench.Statistic().nTotalFrames, before.nTotalFrames + fate.frames);
    EXPECT_EQ(bench.Statistic().nDuplicateFrames, before.nDuplicateFrames + fate.duplicates);
    EXPECT_EQ(bench.engine->m_nFpsFrames, fate.countedForRate);
    EXPECT_EQ(bench.calls.Count("CapturePoint"), fate.polledPointer ? 1u : 0u);
    EXPECT_EQ(bench.sink.Notices(),
              fate.event ? Lines{"event 1001 " + std::to_string(fate.result)} : Lines{});
    EXPECT_EQ(bench.engine->m_bForceFrame, fate.force && fate.sent == Sent::Nothing);
}

INSTANTIATE_TEST_SUITE_P(AllRows, ShareFrameFate, testing::ValuesIn(FATES));

TEST(ShareFrameResend, IsImpossibleBeforeTheFirstFrameOfARun) {
    CEngineBench<> bench;
    bench.capturer.SetResult(-303);
    bench.Start();
    bench.Tick(20);
    bench.SettleEvents();
    EXPECT_EQ(bench.sink.FrameCount(), 0u);
    EXPECT_EQ(bench.sink.CountNotices("event 1001 -303"), 20u);
}

TEST(ShareFrameResend, BeginsAnewWithEachRun) {
    CEngineBench<> bench;
    bench.Start();
    bench.Tick();
    EXPECT_EQ(bench.sink.FrameCount(), 1u);
    EXPECT_EQ(bench.engine->Stop(), 0);
    bench.Advance(5000);
    bench.capturer.SetResult(-302);
    bench.Start();
    bench.Tick(10);
    EXPECT_EQ(bench.sink.FrameCount(), 1u) << "a picture of the former run was sent";
}

TEST(ShareFrameResend, GivesTheSinkAPictureAboutOnceASecond) {
    CEngineBench<> bench;
    bench.Start();
    bench.Tick();
    bench.capturer.SetResult(-302);
    bench.Tick(30); // six seconds: due at 1.2, 2.4, … seconds
    EXPECT_EQ(bench.sink.FrameCount(), 6u);
    EXPECT_EQ(bench.Statistic().nTotalFrames, 6);
}

TEST(ShareFrameResend, MaySendAFrameThatWasNeverFilledWhenItIsForced) {
    CEngineBench<> bench;
    bench.BeginInline();
    bench.engine->m_bForceFrame = true;
    bench.capturer.SetResult(-303);
    bench.Pass(3);
    ASSERT_EQ(bench.sink.FrameCount(), 1u);
    EXPECT_EQ(bench.sink.Frames()[0].firstByte, -1);
    EXPECT_EQ(bench.sink.Frames()[0].size, (TVLSize{0, 0}));
    EXPECT_EQ(bench.Statistic().nTotalFrames, 1);
    EXPECT_FALSE(bench.engine->m_bForceFrame);
}

TEST(ShareFrameResend, NeedsAPreviousFrame) {
    CEngineBench<> bench;
    bench.BeginInline();
    IShareFrame* const a = bench.engine->m_pShareFrameA;
    IShareFrame* const b = bench.engine->m_pShareFrameB;
    bench.engine->m_pShareFrameB = nullptr;
    bench.engine->m_bForceFrame = true;
    bench.capturer.SetResult(-303);
    bench.Pass();
    EXPECT_EQ(bench.sink.FrameCount(), 0u);
    EXPECT_TRUE(bench.engine->m_bForceFrame);
    // One frame alone is used over and over.
    bench.capturer.SetResult(0);
    bench.Passes(2);
    EXPECT_EQ(bench.sink.Frames()[0].frame, a);
    EXPECT_EQ(bench.sink.Frames()[1].frame, a);
    bench.engine->m_pShareFrameB = b;
}

TEST(ShareFrameResend, KeepsThePointerOfItsFirstSending) {
    CEngineBench<> bench(true);
    auto* const image = new CFakePointingImg(bench.calls, nullptr, 0, 0);
    image->AddRef();
    bench.pointing->image = image;
    bench.BeginInline();
    bench.Pass(3);
    bench.Advance(1001);
    bench.capturer.SetResult(-303);
    bench.Pass(3);
    ASSERT_EQ(bench.sink.FrameCount(), 2u);
    EXPECT_TRUE(bench.sink.Frames()[0].pointerCaptured);
    EXPECT_TRUE(bench.sink.Frames()[1].pointerCaptured);
    EXPECT_EQ(bench.calls.Count("CapturePoint"), 1u);
    image->Release();
}

TEST(ShareFrameUnavailable, IsWarnedOfFromTheFifthPassInARowOnAndThenEachTenthTime) {
    if (!IsOnlyTestOfProcess())
        GTEST_SKIP() << "sites count for the life of a process, and this is not its only test";
    CEngineBench<> bench;
    bench.BeginInline();
    bench.capturer.SetResult(-303);
    Lines expected;
    for (int pass = 1; pass <= 26; ++pass) {
        bench.Pass();
        if (pass == 5 || pass == 15 || pass == 25) {
            expected.push_back(ThinnedWarning(
                "[CShareCaptureEngine::_CaptureProcess]>> Capture Content is temporary unavailable, ,times=" +
                std::to_string(pass)));
        }
        ASSERT_EQ(WithoutSourcePlaces(bench.trace.LinesContaining("temporary unavailable")), expected)
            << "pass " << pass;
    }
    for (const std::string& line : bench.trace.LinesContaining("temporary unavailable"))
        EXPECT_EQ(SplitSourcePlace(line)->path, "src/share_capture_engine_pass");
    EXPECT_TRUE(bench.engine->m_bFirstError) << "a warning is no error";
    bench.SettleEvents();
    EXPECT_EQ(bench.sink.CountNotices("event 1001 -303"), 26u);
}

TEST(ShareFrameUnavailable, CountsOnlyPassesInARow) {
    CEngineBench<> bench;
    bench.BeginInline();
    bench.capturer.ScriptResults({-302, -303, -302, -303, 0, -302, -303, -302, -303});
    bench.Passes(9);
    EXPECT_FALSE(bench.trace.Contains("temporary unavailable"));
    EXPECT_EQ(bench.engine->m_nUnavailableTimes, 4);
}

TEST(ShareFrameUnavailable, IsNotCountedWhileThePreviousFrameIsSentInstead) {
    CEngineBench<> bench;
    bench.BeginInline();
    bench.Pass();
    bench.capturer.SetResult(-303);
    bench.Advance(1001);
    bench.Pass();
    EXPECT_EQ(bench.sink.FrameCount(), 2u);
    EXPECT_EQ(bench.engine->m_nUnavailableTimes, 0);
}
