// SPDX-License-Identifier: Apache-2.0
#include "src/share_capturer_dummy.h"

#include "src/app_share_config.h"
#include "src/share_capturer_context.h"
#include "src/share_frame.h"
#include "src/share_ref.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>

#include <memory>
#include <new>

#include <vector>

// The capturer without a screen: a black line that moves down a white picture.

namespace {

using Rows = std::vector<int>;

/// Counts its walks and logs the frame as it is at that moment.
class CCountingContext : public ShareCapturerContext {
public:
    int UpdateShareCapturerContext() override {
        ++walks;
        if (frame != nullptr)
            frame->GetFrameSize(sizeAtWalk);
        return SHARE_RESULT_OK;
    }
    int walks = 0;
    IShareFrame* frame = nullptr;
    TVLSize sizeAtWalk{-1, -1};
};

class ShareCapturerDummy3x4 : public testing::Test {
protected:
    ShareCapturerDummy3x4() { SetSize(3, 4); }
    ~ShareCapturerDummy3x4() override { SetSize(1024, 768); }

    static void SetSize(int width, int height) {
        AppShareConfig::Instance()->m_nDummyCaptureWidth = width;
        AppShareConfig::Instance()->m_nDummyCaptureHeight = height;
    }

    /// The rows that are black through and through; every other row has to be white.
    Rows BlackRows() const {
        Rows black;
        TVLSize size{};
        frame.Get()->GetFrameSize(size);
        for (int row = 0; row < size.cy; ++row) {
            const unsigned char* const line = frame.Get()->GetFrameLineData(row);
            const auto is = [](unsigned char value) {
                return [value](unsigned char byte) { return byte == value; };
            };
            if (std::all_of(line, line + size.cx * 4, is(0)))
                black.push_back(row);
            else
                EXPECT_TRUE(std::all_of(line, line + size.cx * 4, is(255))) << "row " << row;
        }
        return black;
    }

    CManualClockScope clock;
    const std::shared_ptr<CCountingContext> context = std::make_shared<CCountingContext>();
    const ShareRef<CShareFrame> frame{new CShareFrame};
};

} // namespace

TEST_F(ShareCapturerDummy3x4, PaintsABlackLineThatMovesDownRowByRow) {
    CShareCapturerDummy capturer(context);
    for (const int row : {1, 2, 3, 0, 1, 2, 3, 0, 1}) {
        EXPECT_EQ(capturer.Capture(frame.Get()), 0);
        EXPECT_EQ(BlackRows(), Rows{row});
    }
}

TEST_F(ShareCapturerDummy3x4, FillsSizeFormatLineLengthAndTimestamp) {
    CShareCapturerDummy capturer(context);
    frame.Get()->SetFrameSize(50, 40);
    frame.Get()->SetFrameLineBytes(999);
    clock->Advance(std::chrono::milliseconds(1234));
    EXPECT_EQ(capturer.Capture(frame.Get()), 0);
    TVLSize size{};
    frame.Get()->GetFrameSize(size);
    EXPECT_EQ(size, (TVLSize{3, 4}));
    EXPECT_EQ(frame.Get()->GetFrameLineBytes(), 12);
    EXPECT_EQ(frame.Get()->GetFrameDataLen(), 48);
    EXPECT_EQ(frame.Get()->GetFrameDataFormat(), SHARE_FRAME_FORMAT_RGBA);
    EXPECT_EQ(frame.Get()->GetTimestamp(), static_cast<unsigned>(tick_policy::now() / 1000));
    EXPECT_EQ(frame.Get()->GetMetaInfo().rectCapture, TVLRect{});
    EXPECT_EQ(BlackRows(), Rows{1});
}

TEST_F(ShareCapturerDummy3x4, IsBlackThroughoutWhenItIsOneRowHigh) {
    SetSize(2, 1);
    CShareCapturerDummy capturer(context);
    for (int pass = 0; pass < 3; ++pass) {
        EXPECT_EQ(capturer.Capture(frame.Get()), 0);
        EXPECT_EQ(BlackRows(), Rows{0});
    }
}

TEST_F(ShareCapturerDummy3x4, HasTheSizeThatTheSettingsGive) {
    SetSize(0, -3); // settings are at least 1
    CShareCapturerDummy least(context);
    EXPECT_EQ(least.Capture(frame.Get()), 0);
    EXPECT_EQ(frame.Get()->GetFrameDataLen(), 4);
    SetSize(1024, 768);
    CShareCapturerDummy usual(context);
    EXPECT_EQ(usual.Capture(frame.Get()), 0);
    EXPECT_EQ(frame.Get()->GetFrameDataLen(), 1024 * 768 * 4);
    EXPECT_EQ(BlackRows(), Rows{1});
}

TEST_F(ShareCapturerDummy3x4, KeepsItsSizeWhenTheSettingsChange) {
    CShareCapturerDummy capturer(context);
    for (const TVLSize changed : {TVLSize{300, 400}, TVLSize{1, 1}, TVLSize{2147483647, 2147483647}}) {
        SetSize(changed.cx, changed.cy);
        for (int pass = 0; pass < 5; ++pass)
            EXPECT_EQ(capturer.Capture(frame.Get()), 0);
        EXPECT_EQ(frame.Get()->GetFrameDataLen(), 48);
        EXPECT_EQ(BlackRows().size(), 1u);
    }
}

TEST_F(ShareCapturerDummy3x4, CapturesNothingWhereThePictureWouldBeTooLargeForAFrame) {
    for (const TVLSize huge :
         {TVLSize{2147483647, 2147483647}, TVLSize{1, 536870912}, TVLSize{65536, 8192}}) {
        SetSize(huge.cx, huge.cy);
        CShareCapturerDummy capturer(context);
        EXPECT_EQ(capturer.Capture(frame.Get()), -1);
    }
    EXPECT_EQ(context->walks, 0);
    EXPECT_EQ(frame.Get()->GetFrameData(), nullptr);
}

TEST_F(ShareCapturerDummy3x4, RefusesANullFrameAndChangesNothing) {
    CShareCapturerDummy capturer(context);
    EXPECT_EQ(capturer.Capture(nullptr), -1);
    EXPECT_EQ(context->walks, 0);
    EXPECT_EQ(capturer.Capture(frame.Get()), 0);
    EXPECT_EQ(BlackRows(), Rows{1}) << "the line has not moved";
}

TEST_F(ShareCapturerDummy3x4, HasItsContextWalkFirst) {
    CShareCapturerDummy capturer(context);
    context->frame = frame.Get();
    EXPECT_EQ(capturer.Capture(frame.Get()), 0);
    EXPECT_EQ(context->walks, 1);
    EXPECT_EQ(context->sizeAtWalk, (TVLSize{0, 0})) << "the frame was not touched before";
}

TEST_F(ShareCapturerDummy3x4, NeedsNoContext) {
    CShareCapturerDummy capturer(nullptr);
    EXPECT_EQ(capturer.Capture(frame.Get()), 0);
    EXPECT_EQ(BlackRows(), Rows{1});
}

TEST_F(ShareCapturerDummy3x4, TellsTwoPicturesInARowApartByTwoRowsOnly) {
    CShareCapturerDummy capturer(context);
    const ShareRef<CShareFrame> next{new CShareFrame};
    EXPECT_EQ(capturer.Capture(frame.Get()), 0);
    EXPECT_EQ(capturer.Capture(next.Get()), 0);
    Rows changed;
    for (int row = 0; row < 4; ++row) {
        const unsigned char* const before = frame.Get()->GetFrameLineData(row);
        if (!std::equal(before, before + 12, next.Get()->GetFrameLineData(row)))
            changed.push_back(row);
    }
    EXPECT_EQ(changed, (Rows{1, 2}));
}

TEST_F(ShareCapturerDummy3x4, AnswersEverythingElseAsTheBaseDoes) {
    CShareCapturerDummy capturer(context);
    TVLSize size{};
    EXPECT_EQ(capturer.GetCurrentCaptureDisplayId(), SHARE_INVALID_DISPLAY);
    EXPECT_EQ(capturer.GetCurrentCaptureSourceSize(size), -1);
    context->AddSharedWindow(1);
    EXPECT_EQ(capturer.GetCurrentCaptureSourceSize(size), -1) << "no display";
    EXPECT_FALSE(capturer.Reinit());
    EXPECT_FALSE(capturer.PointerCaptured());
    EXPECT_EQ(capturer.SetFPS(5), -5);
}

TEST_F(ShareCapturerDummy3x4, TurnsWhatTheContextThrowsIntoAFailedCapture) {
    class CThrowingContext : public ShareCapturerContext {
    public:
        int UpdateShareCapturerContext() override { throw std::bad_alloc(); }
    };
    const CTraceLog trace;
    CShareCapturerDummy capturer(std::make_shared<CThrowingContext>());
    EXPECT_EQ(capturer.Capture(frame.Get()), -1);
    EXPECT_EQ(trace.CountContaining("[CShareCapturerDummy::Capture]>>fail>>"), 1u);
}
