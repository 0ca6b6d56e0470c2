// SPDX-License-Identifier: Apache-2.0
#include "src/share_frame.h"
#include "tests/src/share_frame_tools.h"
#include "tests/support/trace_log.h"

#include <screenshare/share_graphic_util.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <climits>
#include <string>
#include <vector>

/// The frame form of the blend, and sizes made to fit.

namespace {

constexpr int SIDE = 16;

Held<> Filled(int width, int height, SHARE_FRAME_FORMAT format, const Bytes& pixel) {
    auto frame = NewFrame(width, height, format);
    for (int i = 0; i < frame->GetFrameDataLen(); ++i)
        frame->GetFrameData()[i] = pixel[static_cast<std::size_t>(i) % pixel.size()];
    return frame;
}

Held<> Target(SHARE_FRAME_FORMAT format = SHARE_FRAME_FORMAT_RGBA) {
    return Filled(40, 30, format, {10, 20, 30, 255});
}

const Bytes RED{255, 0, 0, 255};

Held<> Cursor(SHARE_FRAME_FORMAT format = SHARE_FRAME_FORMAT_RGBA) {
    return Filled(SIDE, SIDE, format, RED);
}

Bytes PixelAt(IShareFrame& frame, int x, int y) {
    const unsigned char* const pixel = frame.GetFrameLineData(y) + x * 4;
    return {pixel, pixel + 4};
}

/// The box around the pixels that are the cursor's; all zeros when there are none.
TVLRect Painted(IShareFrame& frame) {
    TVLSize size{};
    frame.GetFrameSize(size);
    TVLRect box{size.cx, size.cy, 0, 0};
    for (int y = 0; y < size.cy; ++y) {
        for (int x = 0; x < size.cx; ++x) {
            if (PixelAt(frame, x, y) != RED)
                continue;
            box = {std::min(box.left, x), std::min(box.top, y), std::max(box.right, x + 1),
                   std::max(box.bottom, y + 1)};
        }
    }
    return box.left < box.right ? box : TVLRect{};
}

bool Blend(const Held<>& dst, int x, int y, const Held<>& src) {
    return TvlGraphicUtil::TvlAlphaBlend(dst.get(), x, y, src.get());
}

} // namespace

TEST(FrameAlphaBlend, RefusesMissingFrames) {
    const auto frame = Target();
    EXPECT_FALSE(TvlGraphicUtil::TvlAlphaBlend(nullptr, 0, 0, frame.get()));
    EXPECT_FALSE(TvlGraphicUtil::TvlAlphaBlend(frame.get(), 0, 0, nullptr));
}

TEST(FrameAlphaBlend, RefusesASourceThatIsLargerInEitherDimension) {
    const auto cursor = Cursor();
    EXPECT_FALSE(Blend(Filled(SIDE - 1, 30, SHARE_FRAME_FORMAT_RGBA, {0}), 0, 0, cursor));
    EXPECT_FALSE(Blend(Filled(40, SIDE - 1, SHARE_FRAME_FORMAT_RGBA, {0}), 0, 0, cursor));
    EXPECT_TRUE(Blend(Filled(SIDE, SIDE, SHARE_FRAME_FORMAT_RGBA, {0}), 0, 0, cursor));
}

TEST(FrameAlphaBlend, TakesSourcesOfThreeFormats) {
    for (const SHARE_FRAME_FORMAT format :
         {SHARE_FRAME_FORMAT_RGBA, SHARE_FRAME_FORMAT_ARGB, SHARE_FRAME_FORMAT_BGRA})
        EXPECT_TRUE(Blend(Target(), 0, 0, Cursor(format))) << format;
    for (const SHARE_FRAME_FORMAT format :
         {SHARE_FRAME_FORMAT_NONE, SHARE_FRAME_FORMAT_RGB, SHARE_FRAME_FORMAT_ABGR, SHARE_FRAME_FORMAT_BGR})
        EXPECT_FALSE(Blend(Target(), 0, 0, Cursor(format))) << format;
}

TEST(FrameAlphaBlend, TakesTargetsOfEveryFormat) {
    for (int format = SHARE_FRAME_FORMAT_RGBA; format <= SHARE_FRAME_FORMAT_BGR; ++format)
        EXPECT_TRUE(Blend(Target(static_cast<SHARE_FRAME_FORMAT>(format)), 0, 0, Cursor())) << format;
    EXPECT_FALSE(Blend(Target(SHARE_FRAME_FORMAT_NONE), 0, 0, Cursor()));
}

TEST(FrameAlphaBlend, PutsTheLeftTopCornerAtThePosition) {
    const auto frame = Target();
    ASSERT_TRUE(Blend(frame, 3, 5, Cursor()));
    EXPECT_EQ(Painted(*frame), (TVLRect{3, 5, 3 + SIDE, 5 + SIDE}));
}

TEST(FrameAlphaBlend, KeepsTheSourceUpright) {
    const auto frame = Target();
    const auto cursor = Cursor();
    std::fill_n(cursor->GetFrameLineData(0), 4 * SIDE, static_cast<unsigned char>(255));
    ASSERT_TRUE(Blend(frame, 3, 5, cursor));
    EXPECT_EQ(PixelAt(*frame, 3, 5), Bytes(4, 255));
    EXPECT_EQ(PixelAt(*frame, 3, 5 + SIDE - 1), RED);
}

TEST(FrameAlphaBlend, ClipsAtEachEdge) {
    struct Case {
        int x;
        int y;
        TVLRect painted;
    };
    for (const Case& each : {Case{-8, 4, {0, 4, 8, 20}}, Case{32, 4, {32, 4, 40, 20}},
                             Case{4, -8, {4, 0, 20, 8}}, Case{4, 22, {4, 22, 20, 30}}}) {
        const auto frame = Target();
        EXPECT_TRUE(Blend(frame, each.x, each.y, Cursor()));
        EXPECT_EQ(Painted(*frame), each.painted) << each.x << "," << each.y;
    }
}

TEST(FrameAlphaBlend, RefusesPositionsWithoutOverlap) {
    const int far[][2] = {{-SIDE, 0},        {40, 0},      {0, -SIDE},   {0, 30},
                          {-17, 0},          {41, 0},      {0, -17},     {INT_MIN, 0},
                          {INT_MAX, 0},      {0, INT_MIN}, {0, INT_MAX}, {INT_MIN, INT_MAX},
                          {INT_MAX, INT_MIN}};
    for (const auto& position : far) {
        const auto frame = Target();
        EXPECT_FALSE(Blend(frame, position[0], position[1], Cursor())) << position[0] << "," << position[1];
        EXPECT_EQ(Painted(*frame), TVLRect{});
    }
    EXPECT_TRUE(Blend(Target(), -SIDE + 1, 0, Cursor()));
    EXPECT_TRUE(Blend(Target(), 0, 29, Cursor()));
}

TEST(FrameAlphaBlend, RefusesASourceWithoutPixels) {
    EXPECT_FALSE(Blend(Target(), 0, 0, NewFrame(0, 4, SHARE_FRAME_FORMAT_RGBA)));
    EXPECT_FALSE(Blend(Target(), 0, 0, NewFrame(4, 0, SHARE_FRAME_FORMAT_RGBA)));
}

TEST(FrameAlphaBlend, LaysPremultipliedColoursOver) {
    const auto frame = Target();
    ASSERT_TRUE(Blend(frame, 0, 0, Filled(4, 4, SHARE_FRAME_FORMAT_RGBA, {64, 0, 128, 128})));
    // 64 + 10 * 127 / 255 and so on, rounded
    EXPECT_EQ(PixelAt(*frame, 1, 1), (Bytes{69, 10, 143, 255}));
    ASSERT_TRUE(Blend(frame, 20, 0, Filled(4, 4, SHARE_FRAME_FORMAT_RGBA, {0, 0, 0, 0})));
    EXPECT_EQ(PixelAt(*frame, 21, 1), (Bytes{10, 20, 30, 255}));
}

TEST(FrameAlphaBlend, TakesTheLastByteForAlphaWhateverTheFormats) {
    const auto frame = Target(SHARE_FRAME_FORMAT_ARGB);
    ASSERT_TRUE(Blend(frame, 0, 0, Filled(4, 4, SHARE_FRAME_FORMAT_ARGB, {255, 9, 9, 0})));
    EXPECT_EQ(PixelAt(*frame, 0, 0), (Bytes{255, 29, 39, 255})) << "a first byte of 255 was taken for alpha";
}

TEST(FrameAlphaBlend, TakesLinesForGaplessWhateverTheirLength) {
    const auto frame = NewFrame(4, 4, SHARE_FRAME_FORMAT_RGBA);
    frame->SetFrameLineBytes(24);
    std::fill_n(frame->GetFrameData(), 4 * 24, static_cast<unsigned char>(1));
    ASSERT_TRUE(Blend(frame, 0, 1, Filled(1, 1, SHARE_FRAME_FORMAT_RGBA, RED)));
    EXPECT_EQ(Part(FirstBytes(*frame, 96), 16, 4), RED);
    EXPECT_EQ(PixelAt(*frame, 0, 1), Bytes(4, 1));
}

TEST(FrameAlphaBlend, PaintsNothingOnATargetOfThreeBytes) {
    const auto frame = Filled(40, 30, SHARE_FRAME_FORMAT_RGB, {7});
    EXPECT_TRUE(Blend(frame, 0, 0, Cursor()));
    EXPECT_EQ(FirstBytes(*frame, 40 * 30 * 3), Bytes(40 * 30 * 3, 7));
}

TEST(FrameAlphaBlend, PaintsNothingFromMemoryThatIsTooShort) {
    const auto frame = Target();
    const auto cursor = NewFrame(SIDE, SIDE, SHARE_FRAME_FORMAT_RGBA);
    Bytes little(SIDE * SIDE * 3, 255);
    cursor->SetExternalBuf(little.data(), Length(little));
    cursor->SetFrameLineBytes(SIDE * 3);
    EXPECT_TRUE(Blend(frame, 0, 0, cursor));
    EXPECT_EQ(PixelAt(*frame, 0, 0), (Bytes{10, 20, 30, 255}));
}

TEST(FrameAlphaBlend, PaintsNothingFromAFrameWithoutMemory) {
    const auto cursor = NewFrame(SIDE, SIDE, SHARE_FRAME_FORMAT_RGBA);
    Bytes pixels(SIDE * SIDE * 4, 255);
    cursor->SetExternalBuf(pixels.data(), Length(pixels));
    cursor->SetExternalBuf(nullptr, 0);
    ASSERT_EQ(cursor->GetFrameData(), nullptr);
    EXPECT_TRUE(Blend(Target(), 0, 0, cursor));
}

TEST(FrameAlphaBlend, LaysAFrameOverItself) {
    const auto frame = Filled(8, 8, SHARE_FRAME_FORMAT_RGBA, RED);
    EXPECT_TRUE(Blend(frame, 2, 2, frame));
    EXPECT_EQ(Painted(*frame), (TVLRect{0, 0, 8, 8}));
}

TEST(FrameAlphaBlend, TracesItsParametersAndTheRectangleFromTheBottom) {
    CTraceLog trace;
    ASSERT_TRUE(Blend(Target(), -8, 4, Cursor()));
    EXPECT_EQ(trace.Lines(),
              (std::vector<std::string>{
                  "[[ScreenShare],[Core]] DETAIL: TvlAlphaBlend params= x=-8 y=4 src.w=16 "
                  "src.h=16 dest.w=40 dest.h=30",
                  "[[ScreenShare],[Core]] DETAIL: TvlAlphaBlend draw rect= x=-8 y=10 w=16 h=16"}));
}

// ---- Sizes

namespace {

struct FitCase {
    TVLSize size;
    TVLSize maxSize;
    TVLSize expected;
};

void ExpectFits(std::initializer_list<FitCase> cases) {
    for (const FitCase& each : cases) {
        const TVLSize got = TvlGraphicUtil::TvlGetMaxCapSize(each.size, each.maxSize);
        EXPECT_TRUE(got == each.expected)
            << each.size.cx << "x" << each.size.cy << " into " << each.maxSize.cx << "x" << each.maxSize.cy
            << " gave " << got.cx << "x" << got.cy;
    }
}

} // namespace

TEST(MaxCapSize, GivesBackWhatFits) {
    ExpectFits({{{800, 600}, {1280, 720}, {800, 600}},
                {{1280, 720}, {1280, 720}, {1280, 720}},
                {{5000, 5000}, {0, 0}, {5000, 5000}},
                {{5000, 600}, {0, 720}, {5000, 600}},
                {{800, 5000}, {1280, -1}, {800, 5000}},
                {{0, 0}, {1280, 720}, {0, 0}}});
}

TEST(MaxCapSize, KeepsTheRatioOfTheSides) {
    ExpectFits({{{1000, 1000}, {1280, 720}, {720, 720}},
                {{2000, 500}, {1000, 1000}, {1000, 250}},
                {{3840, 2160}, {1920, 1200}, {1920, 1080}},
                {{5120, 2880}, {2880, 1800}, {2880, 1620}},
                {{1366, 768}, {1000, 1000}, {1000, 562}}});
}

TEST(MaxCapSize, TakesTheLimitItselfWhenTheRatiosAreClose) {
    ExpectFits({{{1920, 1080}, {1280, 720}, {1280, 720}},
                {{1927, 1080}, {1280, 720}, {1280, 720}},
                // 1.79 against 1.777…: more than a hundredth apart
                {{1790, 1000}, {1280, 720}, {1280, 715}}});
}

TEST(MaxCapSize, ComesDownToNothingWhenTheOtherSideHasNoLimit) {
    ExpectFits({{{200, 200}, {0, 100}, {0, 0}}, {{200, 200}, {100, 0}, {0, 0}}});
}

TEST(MaxCapSize, StandsSizesThatCannotBeDivided) {
    ExpectFits({{{200, 0}, {100, 100}, {100, 0}}, {{0, 200}, {100, 100}, {0, 100}}});
    TvlGraphicUtil::TvlGetMaxCapSize({INT_MAX, INT_MIN}, {1, 1});
    TvlGraphicUtil::TvlGetMaxCapSize({INT_MAX, 1}, {INT_MAX - 1, INT_MAX});
    TvlGraphicUtil::TvlGetMaxCapSize({1, INT_MAX}, {INT_MIN, 1});
}
