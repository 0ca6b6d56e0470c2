// SPDX-License-Identifier: Apache-2.0
#include "src/mac/avfoundation/share_avf_capturer.h"

#include "tests/src/mac/avfoundation/avf_capturer_rig.h"

/// Rate, scale, pointer and resolution of a session.

namespace {

using namespace platform;

class AVFDisplay : public CAVFCapturerRig {
public:
    AVFDisplay() = default;

protected:
    explicit AVFDisplay(const Scene& scene) : CAVFCapturerRig(scene) {}

    /// Whether the session looks for so many pictures without any time going by.
    [[nodiscard]] bool LooksSoOften(unsigned looks) {
        const auto deadline = std::chrono::steady_clock::now() + PATIENCE;
        while (Looks() < looks && std::chrono::steady_clock::now() < deadline)
            std::this_thread::yield();
        return Looks() >= looks;
    }
    TVLSize NextSize() {
        EXPECT_TRUE(TakesPicture());
        return SizeOf(*frame.Get());
    }
};

class AVFWideDisplay : public AVFDisplay {
protected:
    AVFWideDisplay() : AVFDisplay(Scene().Display(0, 0, 2880, 1800)) {}
};

class AVFTurnedDisplay : public AVFDisplay {
protected:
    AVFTurnedDisplay() : AVFDisplay(Scene().Display(0, 0, 1920, 1080)) {}
};

class AVFPointer : public AVFDisplay {
protected:
    AVFPointer() : AVFDisplay(Desk().Pointer(20, 20).Cursor(SquareCursor(GREEN))) {}

    /// Whether the pointer is in the next picture.
    bool StartsWithPointer() {
        EXPECT_EQ(capturer->stopRun(), 0);
        Start();
        EXPECT_TRUE(TakesPicture());
        EXPECT_EQ(Capture(), NO_DATA);
        return Rgb(21, 21) == GREEN;
    }
};

} // namespace

// ---- Rate

TEST_F(AVFDisplay, KeepsTheRateThatIsBelowNothing) {
    const CTraceLog trace;
    EXPECT_EQ(capturer->setFPS(-1), 35);
    EXPECT_EQ(trace.Lines(), Lines{});
    EXPECT_EQ(capturer->setFPS(12), 12);
    EXPECT_EQ(capturer->setFPS(-1), 12);
    EXPECT_TRUE(trace.Contains(Info("[ShareAVFCapturer setFPS to ]12")));
    EXPECT_EQ(capturer->setFPS(0), 0);
    StartAndTake();
}

TEST_F(AVFDisplay, StartsAtTheRateThatItWasToldBefore) {
    EXPECT_EQ(capturer->setFPS(200), 200);
    Start();
    for (unsigned looks = 1; looks <= 10; ++looks, Advance(5))
        ASSERT_TRUE(LooksSoOften(looks)) << looks;
}

TEST_F(AVFDisplay, LooksAtTheRateThatItIsToldWhileItRuns) {
    EXPECT_EQ(capturer->setFPS(10), 10);
    Start();
    ASSERT_TRUE(LooksSoOften(1));
    EXPECT_EQ(capturer->setFPS(100), 100);
    Advance(100);
    for (unsigned looks = 2; looks <= 12; ++looks, Advance(10))
        ASSERT_TRUE(LooksSoOften(looks)) << looks;
}

TEST_F(AVFDisplay, TellsOfAConnectionThatKeepsNoRate) {
    Start();
    EXPECT_EQ(Calls(Operation::IsVideoMinFrameDurationSupported), 1u);
    EXPECT_EQ(Calls(Operation::IsVideoMaxFrameDurationSupported), 1u);
    const std::string tail = ", self = " + Self();
    script->Fail(Operation::IsVideoMinFrameDurationSupported);
    CTraceLog trace;
    EXPECT_EQ(capturer->updateVideoFormat(), 0);
    ASSERT_EQ(trace.CountContaining("WARNING"), 1u);
    EXPECT_TRUE(IsLineAt(trace.LinesContaining("WARNING")[0],
                         Warning("[ShareAVFCapturer updateVideoFormat] video connection can't support "
                                 "MinFrameDuration feature" +
                                 tail),
                         FILE_OF_DISPLAY));
    trace.Clear();
    script->Fail(Operation::IsVideoMaxFrameDurationSupported);
    EXPECT_EQ(capturer->updateVideoFormat(), 0);
    ASSERT_EQ(trace.CountContaining("WARNING"), 1u);
    EXPECT_TRUE(IsLineAt(trace.LinesContaining("WARNING")[0],
                         Warning("[ShareAVFCapturer updateVideoFormat] video connection can't support "
                                 "MaxFrameDuration feature" +
                                 tail),
                         FILE_OF_DISPLAY));
}

TEST_F(AVFDisplay, HasNoFormatBeforeADisplayAndAnOutputAreKnown) {
    Init();
    EXPECT_EQ(capturer->updateVideoFormat(), -2);
    EXPECT_EQ(capturer->initDisplay(true), 0);
    EXPECT_EQ(capturer->updateVideoFormat(), -1);
    EXPECT_EQ(capturer->createVideoInputAndOutput(), 0);
    EXPECT_EQ(capturer->updateVideoFormat(), 0);
}

TEST_F(AVFDisplay, GivesPicturesWithAlphaFirst) {
    StartAndTake();
    EXPECT_EQ(frame.Get()->GetFrameDataFormat(), SHARE_FRAME_FORMAT_ARGB);
    EXPECT_EQ(frame.Get()->GetFrameData()[0], 255);
    EXPECT_EQ(Rgb(5, 5), RED);
    EXPECT_EQ(Rgb(20, 20), GREY);
}

// ---- Scale

TEST_F(AVFDisplay, ScalesToASizeOnce) {
    StartAndTake();
    const CTraceLog trace;
    EXPECT_EQ(capturer->setScale({20, 15}), OK);
    EXPECT_EQ(capturer->scaleFactor(), 0.5F);
    EXPECT_EQ(trace.Lines(), (Lines{Info("[ShareAVFCapturer setScale to ]20 * 15"),
                                    Info("[ShareAVFCapturer setScale returned with ]0")}));
    EXPECT_EQ(capturer->setScale({20, 15}), NOTHING_TO_SCALE);
    EXPECT_EQ(capturer->scaleFactor(), 0.5F);
    EXPECT_EQ(NextSize(), (TVLSize{20, 15}));
    EXPECT_EQ(capturer->setScale({400, 300}), OK) << "there is room for all of it";
    EXPECT_EQ(capturer->scaleFactor(), 1.0F);
    EXPECT_EQ(NextSize(), (TVLSize{40, 30}));
}

TEST_F(AVFDisplay, TakesAScaleThatNoFloatHoldsAndFails) {
    StartAndTake();
    const CTraceLog trace;
    EXPECT_EQ(capturer->setScale({28, 21}), FAILED);
    EXPECT_EQ(capturer->setScale({28, 21}), FAILED);
    EXPECT_EQ(trace.CountContaining(Info("[ShareAVFCapturer setScale returned with ]-1")), 2u);
    EXPECT_EQ(capturer->scaleFactor(), 1.0F);
    EXPECT_EQ(NextSize(), (TVLSize{28, 21}));
}

TEST_F(AVFDisplay, GivesAScaleToTheNextInput) {
    EXPECT_EQ(capturer->setScale({20, 15}), NOTHING_TO_SCALE);
    EXPECT_EQ(capturer->scaleFactor(), 1.0F);
    StartAndTake();
    EXPECT_EQ(capturer->scaleFactor(), 0.5F);
    EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{20, 15}));
}

TEST_F(AVFWideDisplay, IsNeverAskedForLessThanTwoFifths) {
    StartAndTake();
    EXPECT_EQ(capturer->setScale({800, 500}), FAILED) << "no float holds it";
    EXPECT_EQ(capturer->scaleFactor(), 1.0F);
    EXPECT_EQ(NextSize(), (TVLSize{1152, 720}));
}

TEST_F(AVFDisplay, SurvivesSizesThatAreNone) {
    StartAndTake();
    constexpr int LOWEST = -2147483647 - 1;
    for (const TVLSize size : {TVLSize{0, 0}, TVLSize{0, 20}, TVLSize{20, 0}, TVLSize{-1, LOWEST},
                               TVLSize{LOWEST, -1}, TVLSize{-1, 20}}) {
        capturer->setScale(size);
        EXPECT_EQ(capturer->initDisplay(false), 0);
    }
    ASSERT_TRUE(desktop->RemoveDisplay(MAIN));
    EXPECT_EQ(capturer->initDisplay(false), -1);
    capturer->setScale({20, 15});
}

// ---- Pointer

TEST_F(AVFPointer, IsInThePictureUnlessTheCapturerIsToldOtherwise) {
    EXPECT_TRUE(StartsWithPointer());
    capturer->setCapturesCursor(false);
    EXPECT_EQ(capturer->setInputDisplay(MAIN), 0);
    ASSERT_TRUE(TakesPicture());
    EXPECT_EQ(Rgb(21, 21), GREEN) << "not before there is another input";
    EXPECT_FALSE(StartsWithPointer());
    capturer->setCapturesCursor(true);
    EXPECT_TRUE(StartsWithPointer());
}

TEST_F(AVFPointer, IsNotInThePictureWhenTheProcessKeepsItOut) {
    settings->m_nShareConfigFlags = SHARE_CONFIG_FLAG_NO_POINTER;
    capturer = std::make_shared<ShareAVFCapturer>();
    EXPECT_FALSE(StartsWithPointer());
}

// ---- Resolution

TEST_F(AVFDisplay, FollowsTheResolutionWithTheInputThatItHas) {
    StartAndTake();
    EXPECT_EQ(capturer->setScale({20, 15}), OK);
    ASSERT_TRUE(desktop->ResizeDisplay(MAIN, {25, 20}));
    const CTraceLog trace;
    EXPECT_EQ(capturer->setInputDisplay(MAIN), 0);
    EXPECT_TRUE(trace.Contains(Info("[ShareAVFCapturer initDisplay resolution changed]")));
    EXPECT_TRUE(trace.Contains(Info("[ShareAVFCapturer setScale to ]20 * 15")));
    EXPECT_FALSE(trace.Contains("initDisplay returned with"));
    EXPECT_EQ(Calls(Operation::ScreenInputInit), 1u);
    EXPECT_EQ(NextSize(), (TVLSize{18, 14})) << "as wide as what fits";
}

TEST_F(AVFTurnedDisplay, TurnsWhatWasAskedForWithIt) {
    StartAndTake();
    capturer->setScale({1920, 1080});
    ASSERT_TRUE(desktop->ResizeDisplay(MAIN, {1080, 1920}));
    const CTraceLog trace;
    EXPECT_EQ(capturer->setInputDisplay(MAIN), 0);
    EXPECT_EQ(trace.LinesContaining("setScale to"),
              Lines{Info("[ShareAVFCapturer setScale to ]1080 * 1920")});
    EXPECT_EQ(NextSize(), (TVLSize{1080, 1920}));
}

TEST_F(AVFTurnedDisplay, LeavesWhatWasAskedForWhenItHasNotTurned) {
    StartAndTake();
    capturer->setScale({960, 540});
    ASSERT_TRUE(desktop->ResizeDisplay(MAIN, {1280, 720}));
    const CTraceLog trace;
    EXPECT_EQ(capturer->initDisplay(false), 0);
    EXPECT_EQ(trace.LinesContaining("setScale to"), Lines{Info("[ShareAVFCapturer setScale to ]960 * 540")});
    EXPECT_EQ(capturer->scaleFactor(), 0.75F);
}
