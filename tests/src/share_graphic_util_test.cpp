// SPDX-License-Identifier: Apache-2.0
#include "tests/src/alpha_blend_model.h"
#include "tests/support/test_effort.h"
#include "tests/support/trace_log.h"

#include <screenshare/share_graphic_util.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <climits>
#include <cstdio>
#include <random>
#include <string>
#include <vector>

/// The raw form of the blend. The frame form and the sizes have files of their own.

namespace {

using Bytes = std::vector<unsigned char>;
using Pixel = std::array<unsigned char, 4>;

bool Blend(RawBlend& call) {
    return TvlGraphicUtil::TvlAlphaBlend(call.dst.data(), call.dstSize, call.dstRect, call.dstLineBytes,
                                         call.isDstPremultiplied, call.isDstReserved, call.src.data(),
                                         call.srcSize, call.srcRect, call.srcLineBytes,
                                         call.isSrcPremultiplied, call.isAlphaLast);
}

/// One pixel over another, red, green, blue and alpha, nothing premultiplied.
RawBlend OnePixel(const Pixel& dst, const Pixel& src) {
    RawBlend call;
    call.dst.assign(dst.begin(), dst.end());
    call.src.assign(src.begin(), src.end());
    call.dstSize = call.srcSize = {1, 1};
    call.dstRect = call.srcRect = {0, 0, 1, 1};
    call.dstLineBytes = call.srcLineBytes = 4;
    return call;
}

/// An opaque source whose pixels are numbered from 1 by column and row, over an empty target.
RawBlend Numbered(TVLSize dstSize, TVLSize srcSize) {
    RawBlend call;
    call.dstSize = dstSize;
    call.srcSize = srcSize;
    call.dstLineBytes = static_cast<unsigned>(dstSize.cx) * 4;
    call.srcLineBytes = static_cast<unsigned>(srcSize.cx) * 4;
    call.dst.assign(call.dstLineBytes * static_cast<unsigned>(dstSize.cy), 0);
    for (int y = 1; y <= srcSize.cy; ++y) {
        for (int x = 1; x <= srcSize.cx; ++x) {
            const auto column = static_cast<unsigned char>(x);
            const auto row = static_cast<unsigned char>(y);
            call.src.insert(call.src.end(), {column, row, 0, 255});
        }
    }
    return call;
}

/// "column,row" of the source pixel that lies there; "0,0" for none.
std::string SourceAt(const RawBlend& call, int x, int y) {
    const std::size_t place =
        static_cast<std::size_t>(y) * call.dstLineBytes + static_cast<std::size_t>(x) * 4;
    return std::to_string(call.dst[place]) + "," + std::to_string(call.dst[place + 1]);
}

void ExpectRefused(RawBlend call) {
    const Bytes before = call.dst;
    EXPECT_FALSE(Blend(call));
    EXPECT_EQ(call.dst, before);
}

} // namespace

TEST(RawAlphaBlend, RefusesMissingBuffers) {
    RawBlend call = OnePixel({1, 2, 3, 4}, {5, 6, 7, 255});
    const TVLSize one{1, 1};
    const TVLRect all{0, 0, 1, 1};
    EXPECT_FALSE(TvlGraphicUtil::TvlAlphaBlend(nullptr, one, all, 4, false, false, call.src.data(), one, all,
                                               4, false, true));
    EXPECT_FALSE(TvlGraphicUtil::TvlAlphaBlend(call.dst.data(), one, all, 4, false, false, nullptr, one, all,
                                               4, false, true));
}

TEST(RawAlphaBlend, RefusesRectanglesOfDifferentSize) {
    RawBlend call = Numbered({4, 4}, {4, 4});
    call.dstRect = {0, 0, 4, 4};
    for (const TVLRect rect : {TVLRect{0, 0, 3, 4}, TVLRect{0, 0, 4, 3}}) {
        call.srcRect = rect;
        ExpectRefused(call);
    }
}

TEST(RawAlphaBlend, RefusesEmptyAndInvertedRectangles) {
    RawBlend call = Numbered({4, 4}, {4, 4});
    for (const TVLRect rect : {TVLRect{1, 1, 1, 3}, TVLRect{1, 1, 3, 1}, TVLRect{3, 0, 1, 4},
                               TVLRect{0, 3, 4, 1}, TVLRect{0, 0, 0, 0}}) {
        call.dstRect = call.srcRect = rect;
        ExpectRefused(call);
    }
}

TEST(RawAlphaBlend, RefusesRectanglesWhollyOutside) {
    for (const TVLRect outside :
         {TVLRect{4, 0, 8, 4}, TVLRect{-4, 0, 0, 4}, TVLRect{0, 4, 4, 8}, TVLRect{0, -4, 4, 0}}) {
        RawBlend call = Numbered({4, 4}, {4, 4});
        call.dstRect = outside;
        call.srcRect = {0, 0, 4, 4};
        ExpectRefused(call);
        call.dstRect = {0, 0, 4, 4};
        call.srcRect = outside;
        ExpectRefused(call);
    }
}

TEST(RawAlphaBlend, StandsRectanglesAtTheEndsOfAnInt) {
    RawBlend call = Numbered({4, 4}, {4, 4});
    for (const TVLRect far : {TVLRect{INT_MIN, INT_MIN, INT_MAX, INT_MAX},
                              TVLRect{INT_MAX - 1, 0, INT_MIN + 2, 4}, TVLRect{INT_MIN, 0, INT_MIN + 4, 4}}) {
        call.dstRect = call.srcRect = far;
        Blend(call);
        call.srcRect = {0, 0, 4, 4};
        Blend(call);
    }
    call.dstRect = {0, 0, 4, 4};
    call.srcRect = {INT_MAX - 1, 0, INT_MIN + 2, 4};
    ExpectRefused(call);
}

TEST(RawAlphaBlend, RefusesASourceThatHasNotFourBytesAPixel) {
    for (const unsigned lineBytes : {3u, 5u}) {
        RawBlend call = OnePixel({1, 2, 3, 4}, {5, 6, 7, 255});
        call.srcLineBytes = lineBytes;
        ExpectRefused(call);
    }
}

TEST(RawAlphaBlend, RefusesATargetThatHasNeitherThreeNorFourBytesAPixel) {
    for (const unsigned lineBytes : {0u, 2u, 5u}) {
        RawBlend call = OnePixel({1, 2, 3, 4}, {5, 6, 7, 255});
        call.dstLineBytes = lineBytes;
        ExpectRefused(call);
    }
}

TEST(RawAlphaBlend, TakesLinesWithAGapThatIsLessThanAPixel) {
    RawBlend call = Numbered({3, 2}, {3, 2});
    call.dstLineBytes = 14;
    call.dst.assign(28, 9);
    call.dstRect = call.srcRect = {0, 0, 3, 2};
    ASSERT_TRUE(Blend(call));
    EXPECT_EQ(SourceAt(call, 2, 1), "3,2");
    EXPECT_EQ(Bytes(call.dst.begin() + 12, call.dst.begin() + 14), Bytes(2, 9));
}

TEST(RawAlphaBlend, LeavesATransparentPixelAloneWhateverItsColours) {
    RawBlend call = OnePixel({1, 2, 3, 4}, {200, 200, 200, 0});
    EXPECT_TRUE(Blend(call)) << "nothing to do is no failure";
    EXPECT_EQ(call.dst, (Bytes{1, 2, 3, 4}));
}

TEST(RawAlphaBlend, CopiesAnOpaquePixel) {
    RawBlend call = OnePixel({1, 2, 3, 4}, {200, 100, 50, 255});
    EXPECT_TRUE(Blend(call));
    EXPECT_EQ(call.dst, (Bytes{200, 100, 50, 255}));
}

TEST(RawAlphaBlend, CopiesThreeBytesOfAnOpaquePixelIntoThree) {
    RawBlend call = OnePixel({1, 2, 3, 4}, {200, 100, 50, 255});
    call.dstLineBytes = 3;
    EXPECT_TRUE(Blend(call));
    EXPECT_EQ(call.dst, (Bytes{200, 100, 50, 4}));
}

TEST(RawAlphaBlend, ClearsAnOpaquePixelThatIsCopiedOntoItsOwnNeighbour) {
    Bytes pixels{9, 9, 9, 9, 10, 20, 30, 255, 9, 9, 9, 9};
    const TVLRect all{0, 0, 1, 1};
    EXPECT_TRUE(TvlGraphicUtil::TvlAlphaBlend(pixels.data() + 6, {1, 1}, all, 4, false, false,
                                              pixels.data() + 4, {1, 1}, all, 4, false, true));
    EXPECT_EQ(pixels, (Bytes{9, 9, 9, 9, 10, 20, 0, 0, 0, 0, 9, 9})) << "an overlap is refused by the copy";
}

TEST(RawAlphaBlend, MixesIntoAnOpaqueTarget) {
    RawBlend call = OnePixel({100, 100, 100, 255}, {200, 200, 200, 128});
    EXPECT_TRUE(Blend(call));
    EXPECT_EQ(call.dst, (Bytes{150, 150, 150, 255}));
}

TEST(RawAlphaBlend, GivesATransparentTargetNoWeight) {
    RawBlend call = OnePixel({77, 77, 77, 0}, {200, 200, 200, 128});
    EXPECT_TRUE(Blend(call));
    RawBlend other = OnePixel({3, 3, 3, 0}, {200, 200, 200, 128});
    EXPECT_TRUE(Blend(other));
    EXPECT_EQ(call.dst, other.dst);
    EXPECT_TRUE(call.dst[0] == 199 || call.dst[0] == 200) << int{call.dst[0]};
    EXPECT_EQ(call.dst[3], 128);
}

TEST(RawAlphaBlend, WrapsTheColoursOfAPremultipliedTarget) {
    RawBlend call = OnePixel({100, 0, 60, 255}, {50, 0, 0, 128});
    call.isDstPremultiplied = call.isSrcPremultiplied = true;
    EXPECT_TRUE(Blend(call));
    // 50 + 100 * 127 / 255 = 99 and 60 * 127 / 255 = 29, each times an alpha of 255 in one byte.
    EXPECT_EQ(call.dst, (Bytes{99 * 255 % 256, 0, 29 * 255 % 256, 255}));
}

TEST(RawAlphaBlend, KeepsTheLowByteOfAColourBeyondWhite) {
    // Colours above their alpha are no premultiplied picture, and yet somebody may hand them in.
    RawBlend call = OnePixel({0, 0, 0, 0}, {255, 0, 0, 1});
    call.isSrcPremultiplied = true;
    EXPECT_TRUE(Blend(call));
    EXPECT_EQ(call.dst, (Bytes{255 * 255 % 256, 0, 0, 1}));
}

TEST(RawAlphaBlend, FindsAlphaFirstInBothPictures) {
    RawBlend call = OnePixel({255, 100, 100, 100}, {128, 200, 200, 200});
    call.isAlphaLast = false;
    EXPECT_TRUE(Blend(call));
    EXPECT_EQ(call.dst, (Bytes{255, 150, 150, 150}));
}

TEST(RawAlphaBlend, TakesTheNextPixelsByteForTheAlphaOfThree) {
    RawBlend call = OnePixel({100, 100, 100, 255}, {200, 200, 200, 128});
    call.dstLineBytes = 3;
    EXPECT_TRUE(Blend(call));
    EXPECT_EQ(call.dst, (Bytes{150, 150, 150, 255}));
}

TEST(RawAlphaBlend, CutOffAtTheLeftKeepsTheFirstColumns) {
    RawBlend call = Numbered({20, 2}, {16, 2});
    call.dstRect = {-10, 0, 6, 2};
    call.srcRect = {0, 0, 16, 2};
    ASSERT_TRUE(Blend(call));
    EXPECT_EQ(SourceAt(call, 0, 0), "1,1");
    EXPECT_EQ(SourceAt(call, 5, 1), "6,2");
    EXPECT_EQ(SourceAt(call, 6, 0), "0,0");
}

TEST(RawAlphaBlend, CutOffAtTheRightKeepsTheFirstColumns) {
    RawBlend call = Numbered({4, 2}, {4, 2});
    call.dstRect = {2, 0, 6, 2};
    call.srcRect = {0, 0, 4, 2};
    ASSERT_TRUE(Blend(call));
    EXPECT_EQ(SourceAt(call, 1, 0), "0,0");
    EXPECT_EQ(SourceAt(call, 2, 0), "1,1");
    EXPECT_EQ(SourceAt(call, 3, 1), "2,2");
}

TEST(RawAlphaBlend, CutOffAtTheTopOrTheBottomKeepsTheLastRows) {
    for (const TVLRect rect : {TVLRect{0, -3, 2, 1}, TVLRect{0, 3, 2, 7}}) {
        RawBlend call = Numbered({2, 4}, {2, 4});
        call.dstRect = rect;
        call.srcRect = {0, 0, 2, 4};
        ASSERT_TRUE(Blend(call));
        EXPECT_EQ(SourceAt(call, 0, rect.top < 0 ? 0 : 3), "1,4");
    }
}

TEST(RawAlphaBlend, ClippedInTheSourceKeepsTheTargetsLeftAndTop) {
    RawBlend call = Numbered({8, 8}, {4, 4});
    call.dstRect = {1, 1, 7, 7};
    call.srcRect = {-2, -2, 4, 4};
    ASSERT_TRUE(Blend(call));
    EXPECT_EQ(SourceAt(call, 1, 1), "1,1");
    EXPECT_EQ(SourceAt(call, 4, 4), "4,4");
    EXPECT_EQ(SourceAt(call, 5, 5), "0,0");
}

TEST(RawAlphaBlend, TracesWhatIsLeftAfterClipping) {
    CTraceLog trace;
    RawBlend call = Numbered({4, 3}, {4, 2});
    call.dstRect = {-1, 2, 3, 4};
    call.srcRect = {0, 0, 4, 2};
    ASSERT_TRUE(Blend(call));
    EXPECT_EQ(
        trace.Lines(),
        std::vector<std::string>{
            "[[ScreenShare],[Core]] DETAIL: TvlAlphaBlend params= src.x=0 src.y=1 src.w=3 src.h=1 "
            "src.data.x=4 src.data.y=2 dest.x=0 dest.y=2 dest.w=3 dest.h=1 dest.data.x=4 dest.data.y=3"});
}

// ---- Against the model

namespace {

constexpr unsigned kSeed = 7'201;
constexpr long long kPixels = 100'000;

class RandomBlends {
public:
    explicit RandomBlends(unsigned seed) : m_random(seed) {}

    /// `combination` has a bit for each flag and one for the bytes of a target pixel.
    RawBlend Next(unsigned combination) {
        RawBlend call;
        const unsigned dstBpp = (combination & 16u) != 0 ? 3 : 4;
        call.isDstPremultiplied = (combination & 1u) != 0;
        call.isSrcPremultiplied = (combination & 2u) != 0;
        call.isAlphaLast = (combination & 4u) != 0;
        call.isDstReserved = (combination & 8u) != 0;
        call.dstSize = Size();
        call.srcSize = Size();
        call.dstLineBytes = LineBytes(call.dstSize.cx, dstBpp);
        call.srcLineBytes = LineBytes(call.srcSize.cx, 4);
        // One byte more, for the alpha of the last pixel of three.
        call.dst = Noise(call.dstLineBytes * static_cast<unsigned>(call.dstSize.cy) + 1);
        call.src = Noise(call.srcLineBytes * static_cast<unsigned>(call.srcSize.cy));
        SetAlphas(call);
        const int width = Number(1, call.srcSize.cx + 2);
        const int height = Number(1, call.srcSize.cy + 2);
        call.srcRect = RectIn(call.srcSize, width, height);
        call.dstRect = RectIn(call.dstSize, width, height);
        return call;
    }

private:
    int Number(int from, int to) { return std::uniform_int_distribution<int>(from, to)(m_random); }
    TVLSize Size() { return {Number(1, 40), Number(1, 40)}; }

    unsigned LineBytes(int width, unsigned bpp) {
        return static_cast<unsigned>(width) * bpp + static_cast<unsigned>(Number(0, width - 1));
    }

    Bytes Noise(std::size_t size) {
        Bytes bytes(size);
        for (unsigned char& byte : bytes)
            byte = static_cast<unsigned char>(m_random());
        return bytes;
    }

    /// Of each four pixels of the source about one is transparent and one opaque, as in a cursor.
    void SetAlphas(RawBlend& call) {
        const std::size_t alpha = call.isAlphaLast ? 3 : 0;
        for (int y = 0; y < call.srcSize.cy; ++y) {
            for (int x = 0; x < call.srcSize.cx; ++x) {
                const std::size_t place =
                    static_cast<std::size_t>(y) * call.srcLineBytes + static_cast<std::size_t>(x) * 4 + alpha;
                const int kind = Number(0, 3);
                if (kind < 2)
                    call.src[place] = kind == 0 ? 0 : 255;
            }
        }
    }

    /// Mostly inside, at times over an edge or beyond it.
    TVLRect RectIn(TVLSize size, int width, int height) {
        const int left = Place(size.cx, width);
        const int top = Place(size.cy, height);
        return {left, top, left + width, top + height};
    }
    int Place(int side, int length) {
        const int lowest = -length / 4 - 1;
        return Number(lowest, std::max(lowest, side - length / 2));
    }

    std::mt19937 m_random;
};

} // namespace

TEST(RawAlphaBlend, DoesByteForByteWhatTheModelDoes) {
    const long long wanted = kPixels * TestEffort();
    RawBlendCounts counts;
    RandomBlends blends(kSeed);
    long long calls = 0;
    for (; counts.All() < wanted; ++calls) {
        RawBlend call = blends.Next(static_cast<unsigned>(calls % 32));
        RawBlend model = call;
        const bool expected = RawBlendModel(counts).Run(model);
        ASSERT_EQ(Blend(call), expected) << "call " << calls << " of seed " << kSeed;
        ASSERT_EQ(call.dst, model.dst) << "call " << calls << " of seed " << kSeed;
    }
    std::printf("%lld blends, %lld pixels (%lld kept, %lld replaced, %lld mixed), seed %u\n", calls,
                counts.All(), counts.kept, counts.replaced, counts.mixed, kSeed);
    EXPECT_GT(counts.mixed, wanted / 3);
    EXPECT_GT(counts.replaced, wanted / 10);
    EXPECT_GT(counts.kept, wanted / 10);
}
