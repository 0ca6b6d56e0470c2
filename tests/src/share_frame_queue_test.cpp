// SPDX-License-Identifier: Apache-2.0
#include "src/share_frame_queue.h"

#include "src/share_frame.h"
#include "src/share_ref.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <set>
#include <string>
#include <vector>

namespace {

using namespace std::chrono_literals;
using Lines = std::vector<std::string>;

constexpr std::size_t CAPACITY = 5;

class FrameQueue : public testing::Test {
protected:
    /// Empties a list by `pop`. The queue no longer has the frames then.
    std::vector<IShareFrame*> Drain(IShareFrame* (ShareFrameQueue::*pop)()) {
        std::vector<IShareFrame*> frames;
        while (IShareFrame* const frame = (queue.*pop)())
            frames.push_back(frame);
        return frames;
    }
    std::vector<IShareFrame*> DrainCaptured() { return Drain(&ShareFrameQueue::popCapturedFrame); }
    /// What is out has to come back, or nobody ends it.
    void PutBack(const std::vector<IShareFrame*>& frames) {
        for (IShareFrame* const frame : frames)
            queue.pushFreeFrame(frame);
    }
    /// A picture that began at that time, into a free frame.
    IShareFrame* Capture(std::chrono::nanoseconds start, const ShareCaptureTerms& terms = {}) {
        IShareFrame* const frame = queue.popFreeFrame();
        queue.pushCapturedFrame(frame, start, 7, terms);
        return frame;
    }

    ShareFrameQueue queue{CAPACITY};
};

ShareCaptureTerms AfterWithdrawals(std::uint64_t count) {
    ShareCaptureTerms terms;
    terms.withdrawals = count;
    return terms;
}

} // namespace

TEST_F(FrameQueue, HasAsManyFreeFramesAsItsCapacityAndNoPicture) {
    EXPECT_EQ(queue.freeFrameCount(), CAPACITY);
    EXPECT_EQ(queue.popCapturedFrame(), nullptr);
    const std::vector<IShareFrame*> frames = Drain(&ShareFrameQueue::popFreeFrame);
    EXPECT_EQ(std::set<IShareFrame*>(frames.begin(), frames.end()).size(), CAPACITY);
    for (IShareFrame* const frame : frames)
        EXPECT_EQ(dynamic_cast<CShareFrame&>(*frame).GetReference(), 1u);
    EXPECT_EQ(queue.freeFrameCount(), 0u);
    PutBack(frames);
}

TEST_F(FrameQueue, HasNothingWithoutACapacity) {
    ShareFrameQueue none(0);
    EXPECT_EQ(none.freeFrameCount(), 0u);
    EXPECT_EQ(none.popFreeFrame(), nullptr);
    EXPECT_EQ(none.popCapturedFrame(), nullptr);
}

TEST_F(FrameQueue, GivesFreeFramesInTheOrderInWhichTheyBecameFree) {
    const std::vector<IShareFrame*> frames = Drain(&ShareFrameQueue::popFreeFrame);
    const std::vector<IShareFrame*> backwards(frames.rbegin(), frames.rend());
    PutBack(backwards);
    EXPECT_EQ(Drain(&ShareFrameQueue::popFreeFrame), backwards);
    PutBack(frames);
}

TEST_F(FrameQueue, GivesPicturesOldestFirst) {
    const std::vector<IShareFrame*> pushed{Capture(1ms), Capture(2ms), Capture(3ms)};
    EXPECT_EQ(queue.freeFrameCount(), CAPACITY - 3);
    EXPECT_EQ(DrainCaptured(), pushed);
    PutBack(pushed);
}

TEST_F(FrameQueue, GivesTheOldestPictureUpForAFrameToCaptureInto) {
    std::vector<IShareFrame*> pushed;
    for (std::size_t i = 0; i < CAPACITY; ++i)
        pushed.push_back(Capture(1ms * i));
    EXPECT_EQ(queue.freeFrameCount(), 0u);
    EXPECT_EQ(queue.popFreeFrame(), pushed[0]);
    EXPECT_EQ(queue.popFreeFrame(), pushed[1]);
    EXPECT_EQ(DrainCaptured(), std::vector<IShareFrame*>(pushed.begin() + 2, pushed.end()));
    EXPECT_EQ(queue.popFreeFrame(), nullptr) << "all of them are out";
    PutBack(pushed);
}

TEST_F(FrameQueue, KeepsPicturesThatBeganAtTheSameTime) {
    const CTraceLog trace;
    const std::vector<IShareFrame*> pushed{Capture(0ns), Capture(5ms), Capture(5ms)};
    EXPECT_EQ(DrainCaptured(), pushed) << "the first one began when the clock did";
    EXPECT_EQ(trace.Lines(), Lines{});
    PutBack(pushed);
}

TEST_F(FrameQueue, FreesThePictureThatBeganBeforeTheNewestOneAndTracesIt) {
    const CTraceLog trace;
    IShareFrame* const slow = queue.popFreeFrame();
    IShareFrame* const quick = queue.popFreeFrame();
    queue.pushCapturedFrame(quick, 130'999'999ns, 12);
    queue.pushCapturedFrame(slow, 100ms, 95);
    EXPECT_EQ(queue.freeFrameCount(), CAPACITY - 1);
    EXPECT_EQ(trace.Lines(), Lines{Info("pushCapturedFrame, disorder frame, disorder_ms=30, capture_ms=95, "
                                        "last_capture_ms=12")});
    EXPECT_EQ(DrainCaptured(), std::vector<IShareFrame*>{quick});
    PutBack({quick});
}

TEST_F(FrameQueue, MeasuresByTheNewestPictureEvenWhenThatWasFetched) {
    const CTraceLog trace;
    Capture(100ms);
    PutBack(DrainCaptured());
    Capture(40ms);
    Capture(60ms);
    EXPECT_EQ(queue.freeFrameCount(), CAPACITY);
    EXPECT_EQ(trace.Lines(), (Lines{Info("pushCapturedFrame, disorder frame, disorder_ms=60, capture_ms=7, "
                                         "last_capture_ms=7"),
                                    Info("pushCapturedFrame, disorder frame, disorder_ms=40, capture_ms=7, "
                                         "last_capture_ms=7")}))
        << "one that is not kept is no measure";
    IShareFrame* const next = Capture(100ms);
    EXPECT_EQ(DrainCaptured(), std::vector<IShareFrame*>{next});
    PutBack({next});
}

TEST_F(FrameQueue, GivesNoPictureOfOtherTerms) {
    Capture(1ms, AfterWithdrawals(1));
    Capture(2ms, AfterWithdrawals(1));
    IShareFrame* const good = Capture(3ms, AfterWithdrawals(2));
    IShareFrame* const later = Capture(4ms, AfterWithdrawals(1));
    EXPECT_EQ(queue.popCapturedFrame(AfterWithdrawals(2)), good);
    EXPECT_EQ(queue.freeFrameCount(), CAPACITY - 2)
        << "those before it are free again, the one behind is not";
    EXPECT_EQ(DrainCaptured(), std::vector<IShareFrame*>{later});
    PutBack({good, later});
}

TEST_F(FrameQueue, FreesAllPicturesWhenNoneIsOfTheTerms) {
    Capture(1ms, AfterWithdrawals(1));
    Capture(2ms, AfterWithdrawals(2));
    EXPECT_EQ(queue.popCapturedFrame(AfterWithdrawals(3)), nullptr);
    EXPECT_EQ(queue.freeFrameCount(), CAPACITY);
}

TEST_F(FrameQueue, TakesWithdrawalsInterruptionsDisplaysAndTheKindOfShareForTerms) {
    ShareCaptureTerms other;
    other.displayChanges = 1;
    EXPECT_NE(other, ShareCaptureTerms{});
    other = {};
    other.interruptions = 1;
    EXPECT_NE(other, ShareCaptureTerms{});
    other = {};
    other.type = SHARE_TYPE_APP;
    EXPECT_NE(other, ShareCaptureTerms{});
    EXPECT_NE(AfterWithdrawals(1), ShareCaptureTerms{});
    EXPECT_EQ(AfterWithdrawals(1), AfterWithdrawals(1));
}

TEST_F(FrameQueue, IgnoresNoFrame) {
    queue.pushFreeFrame(nullptr);
    queue.pushCapturedFrame(nullptr, 9ms, 1);
    EXPECT_EQ(queue.freeFrameCount(), CAPACITY);
    EXPECT_EQ(queue.popCapturedFrame(), nullptr);
    IShareFrame* const next = Capture(1ms);
    EXPECT_EQ(DrainCaptured(), std::vector<IShareFrame*>{next}) << "it left no time behind";
    PutBack({next});
}

TEST_F(FrameQueue, ReleasesWhatItHasAndNothingThatIsOut) {
    std::vector<ShareRef<IShareFrame>> held;
    IShareFrame* out = nullptr;
    {
        ShareFrameQueue other(3);
        out = other.popFreeFrame();
        IShareFrame* const free = other.popFreeFrame();
        IShareFrame* const captured = other.popFreeFrame();
        for (IShareFrame* const frame : {out, free, captured})
            held.emplace_back(frame);
        other.pushFreeFrame(free);
        other.pushCapturedFrame(captured, 1ms, 1);
    }
    const auto references = [&](std::size_t i) {
        return dynamic_cast<CShareFrame&>(*held[i].Get()).GetReference();
    };
    EXPECT_EQ(references(0), 2u) << "whoever has it releases it";
    EXPECT_EQ(references(1), 1u);
    EXPECT_EQ(references(2), 1u);
    out->Release();
}
