// SPDX-License-Identifier: Apache-2.0
#include "tests/src/share_frame_tools.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <cstring>

/// The pointer's pixels in the frames that the sink gets.

namespace {

constexpr unsigned BOTH = SHARE_CAPTURE_MASK_CONTENT | SHARE_CAPTURE_MASK_POINTER;
const Bytes CONTENT(4, 1);
const Bytes POINTER{90, 60, 30, 255};

/// Frames of 8 by 4, and a pointer of 3 by 2 with its hot point at (1, 1).
class SharePointerPixels : public testing::Test {
protected:
    SharePointerPixels() : picture(NewFrame(3, 2, SHARE_FRAME_FORMAT_RGBA)) {
        for (std::size_t i = 0; i < 6; ++i)
            std::memcpy(picture->GetFrameData() + i * 4, POINTER.data(), 4);
        image = NewFrame<CFakePointingImg>(bench.calls, picture.get(), 1, 1);
        bench.pointing->image = image.get();
        bench.sink.SetFrameHook([this](IShareFrame* frame) {
            delivered.assign(frame->GetFrameData(), frame->GetFrameData() + frame->GetFrameDataLen());
        });
        bench.BeginInline();
    }

    void PointAt(int x, int y) {
        bench.pointing->x = x;
        bench.pointing->y = y;
    }

    /// Which of the delivered pixels are the pointer's; the others have to be the content's.
    TVLRect PointerInDelivered() const {
        TVLRect box{8, 4, 0, 0};
        for (int y = 0; y < 4; ++y) {
            for (int x = 0; x < 8; ++x) {
                const Bytes pixel = Part(delivered, static_cast<std::size_t>(y * 8 + x) * 4, 4);
                if (pixel == CONTENT)
                    continue;
                EXPECT_EQ(pixel, POINTER) << x << "," << y;
                box = {std::min(box.left, x), std::min(box.top, y), std::max(box.right, x + 1),
                       std::max(box.bottom, y + 1)};
            }
        }
        return box;
    }

    Held<> picture;
    Bytes delivered;
    CEngineBench<> bench{true};
    Held<CFakePointingImg> image;
};

} // namespace

TEST_F(SharePointerPixels, StandInTheFrameAtThePositionLessTheHotPoint) {
    PointAt(4, 2);
    bench.Pass(BOTH);
    ASSERT_EQ(bench.sink.FrameCount(), 1u);
    EXPECT_EQ(PointerInDelivered(), (TVLRect{3, 1, 6, 3}));
}

TEST_F(SharePointerPixels, AreCutOffAtTheEdgeOfTheFrame) {
    PointAt(0, 4);
    bench.Pass(BOTH);
    EXPECT_EQ(PointerInDelivered(), (TVLRect{0, 3, 2, 4}));
}

TEST_F(SharePointerPixels, AreNotThereWhenThePointerIsOutside) {
    PointAt(30, 2);
    bench.Pass(BOTH);
    EXPECT_EQ(delivered.size(), 8u * 4u * 4u);
    EXPECT_EQ(PointerInDelivered(), (TVLRect{8, 4, 0, 0}));
    EXPECT_TRUE(bench.sink.Frames()[0].pointerCaptured) << "it was looked for, and is not to be added later";
}

TEST_F(SharePointerPixels, MakeAFrameDifferWhenThePointerHasMoved) {
    bench.engine->m_bCheckDupFrame = true;
    PointAt(4, 2);
    bench.Passes(3, BOTH);
    EXPECT_EQ(bench.Statistic().nDuplicateFrames, 2);
    EXPECT_EQ(bench.sink.FrameCount(), 1u);
    PointAt(5, 2);
    bench.Pass(BOTH);
    EXPECT_EQ(bench.Statistic().nDuplicateFrames, 2);
    EXPECT_EQ(bench.sink.FrameCount(), 2u);
    EXPECT_EQ(PointerInDelivered(), (TVLRect{4, 1, 7, 3}));
}
