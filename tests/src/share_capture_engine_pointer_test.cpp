// SPDX-License-Identifier: Apache-2.0
#include "src/share_frame.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

/// The pointer of a pass: when it is asked for, what a missing one costs, and what the pointing object tells.

namespace {

using Lines = std::vector<std::string>;

const std::string NO_CURSOR = "[CShareCaptureEngine::_CaptureProcess]>>Fail Capture Cursor,";
constexpr unsigned BOTH = SHARE_CAPTURE_MASK_CONTENT | SHARE_CAPTURE_MASK_POINTER;

class SharePointer : public testing::Test {
protected:
    SharePointer() {
        picture->AddRef();
        image = new CFakePointingImg(bench.calls, picture, 3, 5);
        image->AddRef();
        bench.pointing->image = image;
        bench.pointing->x = 100;
        bench.pointing->y = 50;
        bench.BeginInline();
    }
    ~SharePointer() override {
        image->Release();
        picture->Release();
    }

    void ExpectDeliveredWithoutPointer() {
        bench.engine->m_bFirstError = true;
        bench.Pass(BOTH);
        ASSERT_EQ(bench.sink.FrameCount(), 1u);
        EXPECT_FALSE(bench.sink.Frames()[0].pointerCaptured);
        const Lines lines = bench.trace.LinesContaining("ERROR");
        ASSERT_EQ(lines.size(), 1u);
        EXPECT_TRUE(IsLineAt(lines[0], Error(NO_CURSOR), "src/share_capture_engine_pass"));
    }

    CShareFrame* const picture = new CShareFrame;
    CFakePointingImg* image = nullptr;
    CEngineBench<> bench{true};
};

/// A pointing object such as the library's own: it does not offer the poll of the pass.
class CSilentPointing final : public ISharePointing {
public:
    int AddSink(ISharePointingSink*) override { return 0; }
    int RemoveSink(ISharePointingSink*) override { return 0; }
    int CleanSink() override { return 0; }
    int SetBaseDisplayID(unsigned) override { return 0; }
};

} // namespace

TEST_F(SharePointer, IsMarkedInAFrameThatGotIt) {
    bench.capturer.Change([](CFakeCapturer::Answers& answers) { answers.rectCapture = {1, 2, 9, 6}; });
    TVLRect shown{};
    bench.sink.SetFrameHook([&](IShareFrame* frame) { shown = frame->GetMetaInfo().rectCapture; });
    bench.Pass(BOTH);
    ASSERT_EQ(bench.sink.FrameCount(), 1u);
    EXPECT_TRUE(bench.sink.Frames()[0].pointerCaptured);
    EXPECT_EQ(shown, (TVLRect{1, 2, 9, 6})) << "the rest of the meta information was lost";
    EXPECT_FALSE(bench.trace.Contains(NO_CURSOR));
}

TEST_F(SharePointer, IsMarkedEvenWhenItsImageHasNoPicture) {
    auto* const empty = new CFakePointingImg(bench.calls, nullptr, 0, 0);
    empty->AddRef();
    bench.pointing->image = empty;
    bench.Pass(BOTH);
    EXPECT_TRUE(bench.sink.Frames()[0].pointerCaptured);
    EXPECT_FALSE(bench.trace.Contains(NO_CURSOR));
    empty->Release();
}

TEST_F(SharePointer, IsPolledInTheFormatAndScaleOfTheFrame) {
    bench.capturer.Change([](CFakeCapturer::Answers& answers) {
        answers.format = SHARE_FRAME_FORMAT_ARGB;
        answers.rectCapture = {0, 0, 4, 2};
    });
    bench.Pass(BOTH);
    EXPECT_EQ(bench.pointing->polledFormat, SHARE_FRAME_FORMAT_ARGB);
    EXPECT_EQ(bench.pointing->polledScale, 2.0F);
    EXPECT_EQ(bench.calls.Count("CapturePoint without scale"), 0u);
}

TEST_F(SharePointer, IsNotPolledWhenThePassWantsContentOnly) {
    bench.pointing->result = -1;
    bench.Pass(SHARE_CAPTURE_MASK_CONTENT);
    EXPECT_EQ(bench.calls.Count("PointerCaptured"), 0u);
    EXPECT_EQ(bench.calls.Count("CapturePoint"), 0u);
    EXPECT_FALSE(bench.trace.Contains(NO_CURSOR));
    EXPECT_EQ(bench.sink.FrameCount(), 1u);
}

TEST_F(SharePointer, IsNotPolledWhenTheClientShowsItsOwn) {
    bench.pointing->result = -1;
    EXPECT_EQ(bench.engine->EnableExternalISharePointing(true), 0);
    bench.Pass(BOTH);
    EXPECT_EQ(bench.calls.Count("CapturePoint"), 0u);
    EXPECT_FALSE(bench.trace.Contains(NO_CURSOR));
    EXPECT_FALSE(bench.sink.Frames()[0].pointerCaptured);
}

TEST_F(SharePointer, IsNotPolledWhenTheCapturersPictureHasIt) {
    bench.pointing->result = -1;
    bench.capturer.Change([](CFakeCapturer::Answers& answers) { answers.pointerCaptured = true; });
    bench.Passes(3, BOTH);
    EXPECT_EQ(bench.calls.Count("PointerCaptured"), 3u);
    EXPECT_EQ(bench.calls.Count("CapturePoint"), 0u);
    EXPECT_FALSE(bench.trace.Contains(NO_CURSOR));
}

TEST_F(SharePointer, IsNotPolledAfterACaptureThatFailed) {
    bench.capturer.ScriptResults({-1, -7, -203, -302, -303, -304});
    bench.Passes(6, BOTH);
    EXPECT_EQ(bench.calls.Count("PointerCaptured"), 0u);
    EXPECT_EQ(bench.calls.Count("CapturePoint"), 0u);
}

TEST_F(SharePointer, CostsOneLineWhenThereIsNoPointingObject) {
    bench.engine->GivePointing(nullptr);
    bench.Forget();
    ExpectDeliveredWithoutPointer();
}

TEST_F(SharePointer, CostsOneLineWhenThePollFails) {
    bench.pointing->result = -1;
    ExpectDeliveredWithoutPointer();
    EXPECT_EQ(bench.calls.Count("GetImgData"), 0u);
}

TEST_F(SharePointer, CostsOneLineWithAPointingObjectThatDoesNotOfferThePoll) {
    bench.engine->GivePointing(new CSilentPointing);
    bench.Forget();
    ExpectDeliveredWithoutPointer();
}

TEST_F(SharePointer, CostsOneLineWhenThereIsNoImage) {
    bench.pointing->image = nullptr;
    ExpectDeliveredWithoutPointer();
}

TEST_F(SharePointer, IsReportedMissingAlsoWithoutContent) {
    if (!IsOnlyTestOfProcess())
        GTEST_SKIP() << "sites count for the life of a process, and this is not its only test";
    bench.pointing->result = -1;
    bench.capturer.Change([](CFakeCapturer::Answers& answers) { answers.maxSizeResult = -1; });
    bench.Pass(BOTH);
    EXPECT_EQ(WithoutSourcePlaces(bench.trace.LinesContaining("ERROR")),
              (Lines{Error("[CShareCaptureEngine::_CaptureProcess]>>Fail Capture Content, ret=4294967295"),
                     ThinnedError(NO_CURSOR)}));
}

TEST_F(SharePointer, StoresThePositionThatItIsTold) {
    EXPECT_EQ(bench.engine->OnPointingPosChanged(-3, 7), 0);
    EXPECT_EQ(bench.engine->m_nPointX, -3);
    EXPECT_EQ(bench.engine->m_nPointY, 7);
}

TEST_F(SharePointer, HoldsOneReferenceOnTheLatestImage) {
    auto* const next = new CFakePointingImg(bench.calls, nullptr, 0, 0);
    next->AddRef();
    EXPECT_EQ(bench.engine->OnPointingImgChanged(image), 0);
    EXPECT_EQ(image->GetReference(), 2u);
    EXPECT_EQ(bench.engine->OnPointingImgChanged(image), 0);
    EXPECT_EQ(image->GetReference(), 2u) << "the same image is counted once";
    EXPECT_EQ(bench.engine->OnPointingImgChanged(next), 0);
    EXPECT_EQ(image->GetReference(), 1u);
    EXPECT_EQ(next->Release(), 1u);
    EXPECT_EQ(bench.engine->OnPointingImgChanged(next), 0);
    EXPECT_EQ(bench.calls.Count("image deleted"), 0u) << "told of its own image, the engine let go of it";
    EXPECT_EQ(bench.engine->OnPointingImgChanged(nullptr), 0);
    EXPECT_EQ(bench.calls.Count("image deleted"), 1u);
    EXPECT_EQ(bench.engine->m_pCursorImg, nullptr);
}

TEST_F(SharePointer, NeitherPositionNorImageReachTheSink) {
    bench.Pass(BOTH);
    bench.SettleEvents();
    EXPECT_EQ(bench.sink.Notices(), Lines{});
}
