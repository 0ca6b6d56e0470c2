// SPDX-License-Identifier: Apache-2.0
#include "src/share_capture_engine_pass.h"
#include "src/share_frame.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <cstring>
#include <string>
#include <vector>

/// What counts as a duplicate, and how long duplicates are held back.

namespace {

using Lines = std::vector<std::string>;

/// An engine whose two frames hold the same picture, checking on.
class ShareDuplicates : public testing::Test {
protected:
    ShareDuplicates() {
        bench.BeginInline();
        bench.Passes(2);
        bench.engine->m_bCheckDupFrame = true;
        bench.Forget();
    }

    bool IsHeldBack() { return bench.engine->_CheckFrameDuplicate(bench.engine->_GetCurShareFrame()); }

    CEngineBench<> bench;
};

void Fill(IShareFrame& frame, int width, int height, unsigned char value) {
    frame.SetFrameDataFormat(SHARE_FRAME_FORMAT_BGRA);
    frame.SetFrameSize(width, height);
    std::memset(frame.GetFrameData(), value, static_cast<std::size_t>(frame.GetFrameDataLen()));
}

} // namespace

TEST_F(ShareDuplicates, AreNotLookedForUntilThatIsAskedFor) {
    bench.engine->m_bCheckDupFrame = false;
    bench.Passes(5);
    EXPECT_EQ(bench.sink.FrameCount(), 5u);
    EXPECT_EQ(bench.Statistic().nDuplicateFrames, 0);
}

TEST_F(ShareDuplicates, AreHeldBackForAThousandMillisecondsAndThenOneIsLetThrough) {
    const unsigned start = ShareTickNow();
    EXPECT_TRUE(IsHeldBack());
    EXPECT_EQ(bench.engine->m_tickDupStart, start);
    bench.Advance(1000);
    EXPECT_TRUE(IsHeldBack());
    EXPECT_EQ(bench.engine->m_tickDupStart, start);
    bench.Advance(1);
    EXPECT_FALSE(IsHeldBack());
    EXPECT_EQ(bench.engine->m_tickDupStart, start + 1001);
    EXPECT_TRUE(IsHeldBack()) << "the time starts again";
    EXPECT_EQ(bench.Statistic().nDuplicateFrames, 4) << "the one let through counts, too";
}

TEST_F(ShareDuplicates, LetAStillPictureThroughAboutOnceASecond) {
    int passes = 0;
    while (passes < 100) { // twenty seconds
        bench.Advance(200);
        bench.Pass();
        ++passes;
    }
    // The first one starts the time; then one each 1001 ms, at the next pass: each 1.2 s.
    EXPECT_EQ(bench.sink.FrameCount(), 16u);
    EXPECT_EQ(bench.Statistic().nDuplicateFrames, passes);
}

TEST(ShareDuplicatesOfAStillPicture, AreHeldBackBehindTheFirstFrameOfARun) {
    CEngineBench<> bench;
    bench.engine->m_bCheckDupFrame = true;
    bench.Start();
    bench.Tick(5);
    EXPECT_EQ(bench.sink.FrameCount(), 1u);
    EXPECT_EQ(bench.Statistic().nDuplicateFrames, 4);
    EXPECT_EQ(bench.Statistic().nTotalFrames, 1);
}

TEST_F(ShareDuplicates, ForgetTheirTimeWithADifferentPicture) {
    EXPECT_TRUE(IsHeldBack());
    bench.capturer.SetFill(9);
    bench.Pass();
    EXPECT_EQ(bench.engine->m_tickDupStart, 0u);
    EXPECT_EQ(bench.sink.FrameCount(), 1u);
    EXPECT_EQ(bench.Statistic().nDuplicateFrames, 1);
}

TEST_F(ShareDuplicates, AreFramesThatDifferInNoByte) {
    IShareFrame& frame = *bench.engine->_GetCurShareFrame();
    const int length = frame.GetFrameDataLen();
    for (const int at : {0, length / 2, length - 1}) {
        frame.GetFrameData()[at] ^= 1;
        EXPECT_FALSE(IsHeldBack()) << "a change at " << at << " was overlooked";
        frame.GetFrameData()[at] ^= 1;
        EXPECT_TRUE(IsHeldBack());
    }
}

TEST_F(ShareDuplicates, HaveTheSameLengthWhateverTheirShape) {
    Fill(*bench.engine->_GetCurShareFrame(), 8, 2, 1);
    EXPECT_FALSE(IsHeldBack()) << "a shorter picture that begins alike is another one";
    Fill(*bench.engine->_GetCurShareFrame(), 4, 8, 1);
    EXPECT_TRUE(IsHeldBack()) << "only the bytes are looked at";
}

TEST_F(ShareDuplicates, IncludeTwoFramesWithoutPixels) {
    bench.engine->m_pShareFrameA->SetFrameSize(0, 0);
    bench.engine->m_pShareFrameB->SetFrameSize(0, 0);
    EXPECT_TRUE(IsHeldBack());
}

TEST_F(ShareDuplicates, IncludeTwoFramesThatNeverHadPixels) {
    CEngineBench<> fresh;
    fresh.engine->m_bCheckDupFrame = true;
    ASSERT_EQ(fresh.engine->m_pShareFrameA->GetFrameData(), nullptr);
    EXPECT_TRUE(fresh.engine->_CheckFrameDuplicate(fresh.engine->_GetCurShareFrame()));
}

TEST_F(ShareDuplicates, AreOnlyFoundInTheCurrentFrameOfThePair) {
    CShareFrame* const other = new CShareFrame;
    other->AddRef();
    EXPECT_FALSE(bench.engine->_CheckFrameDuplicate(nullptr));
    EXPECT_FALSE(bench.engine->_CheckFrameDuplicate(bench.engine->_GetPreShareFrame()));
    EXPECT_FALSE(bench.engine->_CheckFrameDuplicate(other));
    IShareFrame* const current = bench.engine->m_pCurShareFrame;
    bench.engine->m_pCurShareFrame = other; // neither of the pair
    EXPECT_FALSE(bench.engine->_CheckFrameDuplicate(other));
    bench.engine->m_pCurShareFrame = current;
    EXPECT_EQ(bench.Statistic().nDuplicateFrames, 0);
    other->Release();
}

TEST_F(ShareDuplicates, AreNotLookedForWithoutASecondFrame) {
    IShareFrame* const b = bench.engine->m_pShareFrameB;
    bench.engine->m_pShareFrameB = nullptr;
    EXPECT_FALSE(bench.engine->_CheckFrameDuplicate(bench.engine->m_pShareFrameA));
    bench.engine->m_pShareFrameB = b;
}

TEST_F(ShareDuplicates, AreLookedForInWhicheverFrameIsCurrent) {
    bench.engine->m_pCurShareFrame = bench.engine->m_pShareFrameB;
    EXPECT_TRUE(IsHeldBack());
    bench.engine->m_pCurShareFrame = bench.engine->m_pShareFrameA;
    EXPECT_TRUE(IsHeldBack());
}

TEST_F(ShareDuplicates, AreLetThroughOnceWhenAFrameIsForced) {
    bench.engine->m_bForceFrame = true;
    bench.Pass();
    EXPECT_EQ(bench.sink.FrameCount(), 1u);
    EXPECT_EQ(bench.Statistic().nDuplicateFrames, 0) << "a forced frame is not compared";
    EXPECT_FALSE(bench.engine->m_bForceFrame);
    bench.Pass();
    EXPECT_EQ(bench.sink.FrameCount(), 1u);
    EXPECT_EQ(bench.Statistic().nDuplicateFrames, 1);
}

TEST_F(ShareDuplicates, LeaveAForcedFrameForTheFirstGoodCapture) {
    bench.engine->m_bForceFrame = true;
    bench.capturer.ScriptResults({-1, -1, 0});
    bench.Passes(2);
    EXPECT_TRUE(bench.engine->m_bForceFrame);
    bench.Pass();
    EXPECT_FALSE(bench.engine->m_bForceFrame);
    EXPECT_EQ(bench.sink.FrameCount(), 1u);
}

TEST_F(ShareDuplicates, EndThePassBeforeItReportsItsPointer) {
    bench.engine->GivePointing(nullptr);
    bench.Forget();
    bench.Passes(3, 3);
    EXPECT_EQ(bench.Statistic().nDuplicateFrames, 3);
    EXPECT_EQ(bench.trace.Lines(), Lines{});
}

TEST_F(ShareDuplicates, LeaveTheCurrentFrameToBeOverwritten) {
    IShareFrame* const current = bench.engine->_GetCurShareFrame();
    bench.Passes(3);
    EXPECT_EQ(bench.engine->_GetCurShareFrame(), current);
    const std::vector<IShareFrame*> into = bench.capturer.CapturedInto();
    EXPECT_EQ(std::vector<IShareFrame*>(into.end() - 3, into.end()), (std::vector<IShareFrame*>(3, current)));
}
