// SPDX-License-Identifier: Apache-2.0
#include "tests/platform/av_foundation_rig.h"

#include <cstddef>
#include <cstdint>
#include <memory>
#include <mutex>
#include <vector>

/// What samples tell of the stack of windows, and of the display.

namespace {

using namespace platform;

class AVFoundationStacks : public CSessionRig {
protected:
    /// Beside the display that is captured, so that nothing of what happens to it can be seen there.
    static constexpr CGWindowID UNSEEN = 8;

    static Scene SceneWithAnUnseenWindow() {
        Scene scene = RigScene();
        scene.Window(UNSEEN).At(41, 1, 10, 10).Colour(0x00FF00);
        return scene;
    }

    AVFoundationStacks() : CSessionRig(SceneWithAnUnseenWindow()) {}

    /// A stack that differs only where nobody looks.
    void Restack() {
        const std::uint64_t before = Now().after;
        m_left = m_left == 41.0F ? 45.0F : 41.0F;
        ASSERT_TRUE(server->MoveWindow(UNSEEN, {m_left, 1}));
        ASSERT_GT(Now().after, before);
    }

    /// Of a sample of now.
    CMSampleBufferGenerations Now() const {
        const std::uint64_t generation = server->GetWindows()->Generation();
        return {generation, generation};
    }

    void ShowCursor(float x, float y) {
        SimulatedCursor cursor;
        cursor.representations.push_back({4, 4, 1.0F, SimulatedContent::Colour(0xFFFFFF)});
        server->SetCursor(cursor);
        server->SetPointer(CGPoint{x, y});
    }

private:
    float m_left = 41.0F;
};

constexpr Colour WHITE{255, 255, 255, 255};

/// Keeps all samples.
struct Keeper {
    void Take(const CMSampleBufferRef& sample) {
        const std::lock_guard<std::mutex> lock(mutex);
        samples.push_back(sample);
    }
    CVPixelBufferRef Image(std::size_t number) {
        const std::lock_guard<std::mutex> lock(mutex);
        return CMSampleBufferGetImageBuffer(samples.at(number).get());
    }

    std::mutex mutex;
    std::vector<CMSampleBufferRef> samples; // guarded by mutex
};

} // namespace

TEST_F(AVFoundationStacks, GiveASampleOfTheSamePixelsWhenOnlyTheStackHasChanged) {
    Keeper keeper;
    taker->inside = [&keeper](const CMSampleBufferRef& sample) { keeper.Take(sample); };
    StartAndTake();
    const SampleCopy first = taker->Last();
    EXPECT_EQ(first.generations, Now());
    Restack();
    TakeNext(2);
    EXPECT_EQ(taker->Last().generations, Now());
    EXPECT_EQ(taker->Last().bytes, first.bytes);
    EXPECT_EQ(keeper.Image(1), keeper.Image(0)) << "painted for nothing";
    EXPECT_EQ(CopySample(keeper.samples[0]).generations, first.generations) << "a sample has changed";
}

TEST_F(AVFoundationStacks, GiveNoneWhenNothingHasChangedAtAll) {
    StartAndTake();
    Restack();
    TakeNext(2);
    Settle();
    EXPECT_EQ(taker->came.Count(), 2);
}

TEST_F(AVFoundationStacks, ReplaceASampleThatMayHaveShownTwoStacks) {
    StartAndTake();
    Settle();
    server->SetPictureLag(RIG_PERIOD * 5 / 2);
    const CMSampleBufferGenerations first = Now();
    Restack();
    TakeNext(2);
    EXPECT_EQ(taker->Last().generations, (CMSampleBufferGenerations{first.before, Now().after}));
    Tick();
    Tick();
    Tick();
    ASSERT_TRUE(taker->came.Reaches(3)) << "the desktop has settled, and nobody says so";
    EXPECT_EQ(taker->Last().generations, Now());
    Settle();
    EXPECT_EQ(taker->came.Count(), 3);
}

TEST_F(AVFoundationStacks, TellOfTheStackBesideRepeatedSamplesToo) {
    input->setRemovesDuplicateFrames(false);
    StartAndTake();
    TakeNext(2);
    Restack();
    TakeNext(3);
    EXPECT_EQ(taker->Last().generations, Now());
    TakeNext(4);
    EXPECT_EQ(taker->Last().generations, Now()) << "it repeats the one before";
}

TEST_F(AVFoundationStacks, ConfirmThePixelsOfACropRectangleWhenOthersHaveChanged) {
    input->setCropRect({{20, 15}, {10, 10}});
    StartAndTake();
    ASSERT_TRUE(server->MoveWindow(RIG_WINDOW, {2, 2}));
    TakeNext(2);
    EXPECT_EQ(taker->Last().generations, Now());
    EXPECT_EQ(taker->Last().At(5, 5), RIG_GREY);
    ColourWindow(0x00FF00);
    Settle();
    EXPECT_EQ(taker->came.Count(), 2) << "the stack is the same";
}

TEST_F(AVFoundationStacks, HaveTheNewestStackUnderAPointerThatIsDrawnIn) {
    server->SetPointerModes(true, false);
    ShowCursor(20, 10);
    input->setCapturesCursor(true);
    StartAndTake();
    Restack();
    TakeNext(2);
    EXPECT_EQ(taker->Last().generations, Now());
    EXPECT_EQ(taker->Last().At(21, 11), WHITE);
    server->SetPointer(CGPoint{30, 20});
    TakeNext(3);
    EXPECT_EQ(taker->Last().generations, Now());
    EXPECT_EQ(taker->Last().At(31, 21), WHITE);
    EXPECT_EQ(taker->Last().At(21, 11), RIG_GREY);
    Settle();
    EXPECT_EQ(taker->came.Count(), 3);
}

TEST_F(AVFoundationStacks, LetNoMoreSamplesWaitThanThereArePictures) {
    output->setAlwaysDiscardsLateVideoFrames(false);
    CGate gate;
    CTally entered;
    taker->inside = [&](const CMSampleBufferRef&) {
        entered.Add();
        EXPECT_TRUE(gate.Passes());
    };
    Start();
    ASSERT_TRUE(entered.Reaches(1));
    for (int i = 0; i < 20; ++i) {
        Restack();
        Tick();
    }
    ColourWindow(0x00FF00);
    Tick();
    Tick();
    gate.Open();
    ASSERT_TRUE(taker->came.Reaches(3));
    UntilQueueIsEmpty();
    EXPECT_EQ(taker->came.Count(), 3) << "the first one, its last confirmation, and the green one";
    EXPECT_EQ(taker->Last().generations, Now());
    EXPECT_EQ(taker->Last().At(0, 0), RIG_GREEN);
}

TEST_F(AVFoundationStacks, GiveNoneOfAStackWithoutASampleBefore) {
    input->setCropRect({{41, 0}, {10, 10}});
    Start();
    UntilLooks(1);
    Restack();
    Settle();
    EXPECT_EQ(taker->came.Count(), 0);
    input->setCropRect({});
    TakeNext(1);
    EXPECT_EQ(taker->Last().generations, Now());
}

TEST_F(AVFoundationStacks, TellWhereTheirDisplayLies) {
    StartAndTake();
    EXPECT_EQ(taker->Last().displayRect, (CGRect{{0, 0}, {40, 30}}));
    session->removeInput(input);
    input = AVCaptureScreenInput::initWithDisplayID(2);
    input->setMinFrameDuration(CMTimeMake(1, 10));
    input->setCropRect({{5, 5}, {10, 10}});
    input->setScaleFactor(0.5F);
    session->addInput(input);
    TakeNext(2);
    ASSERT_EQ(taker->Last().width, 5u);
    EXPECT_EQ(taker->Last().displayRect, (CGRect{{40, 0}, {20, 20}})) << "all of it, however little is shown";
}
