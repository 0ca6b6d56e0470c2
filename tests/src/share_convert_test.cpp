// SPDX-License-Identifier: Apache-2.0
#include "src/share_frame.h"
#include "tests/src/share_frame_tools.h"

#include <screenshare/share_convert.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstddef>
#include <stdexcept>
#include <string>
#include <utility>

namespace {

constexpr unsigned char UNTOUCHED = 0xA5;
/// What rounding and the means of means may make of a sample.
constexpr int TOLERANCE = 2;

struct Rgb {
    int r, g, b;
};

/// Where the components of a pixel lie.
struct Form {
    SHARE_FRAME_FORMAT format;
    int bytes, r, g, b;
};

constexpr std::array<Form, 6> FORMS{{
    {SHARE_FRAME_FORMAT_RGBA, 4, 0, 1, 2},
    {SHARE_FRAME_FORMAT_ARGB, 4, 1, 2, 3},
    {SHARE_FRAME_FORMAT_RGB, 3, 0, 1, 2},
    {SHARE_FRAME_FORMAT_BGRA, 4, 2, 1, 0},
    {SHARE_FRAME_FORMAT_ABGR, 4, 3, 2, 1},
    {SHARE_FRAME_FORMAT_BGR, 3, 2, 1, 0},
}};

/// Blocks of different colours that slide into each other: no plane and no component can be taken for
/// another.
Rgb ColourAt(int x, int y) {
    return {(x * 23 + y * 5) % 256, (40 + y * 31) % 256, (200 + x * 249) % 256};
}

Held<> PaintedFrame(int width, int height, const Form& form, int lineBytes = 0) {
    auto frame = NewFrame(width, height, form.format);
    if (lineBytes != 0)
        frame->SetFrameLineBytes(lineBytes);
    for (int y = 0; y < height; ++y) {
        for (int x = 0; x < width; ++x) {
            unsigned char* const pixel = frame->GetFrameLineData(y) + std::ptrdiff_t{x} * form.bytes;
            const Rgb colour = ColourAt(x, y);
            pixel[form.r] = static_cast<unsigned char>(colour.r);
            pixel[form.g] = static_cast<unsigned char>(colour.g);
            pixel[form.b] = static_cast<unsigned char>(colour.b);
        }
    }
    return frame;
}

/// BT.601, limited range, from the definition.
struct Yuv {
    double y, u, v;
};
Yuv YuvOf(double r, double g, double b) {
    return {16 + (65.481 * r + 128.553 * g + 24.966 * b) / 255,
            128 + (-37.797 * r - 74.203 * g + 112.0 * b) / 255,
            128 + (112.0 * r - 93.786 * g - 18.214 * b) / 255};
}

/// Mean colour of a block that may be cut at the picture's edges.
Yuv BlockAt(int blockX, int blockY, int width, int height) {
    double r = 0, g = 0, b = 0;
    int count = 0;
    for (int y = blockY * 2; y < std::min(blockY * 2 + 2, height); ++y) {
        for (int x = blockX * 2; x < std::min(blockX * 2 + 2, width); ++x, ++count) {
            const Rgb colour = ColourAt(x, y);
            r += colour.r, g += colour.g, b += colour.b;
        }
    }
    return YuvOf(r / count, g / count, b / count);
}

/// A plane with room between its rows and behind the last one.
struct Plane {
    Plane(int rowBytes, int rowCount, int gap)
        : width(rowBytes),
          height(rowCount),
          stride(rowBytes + gap),
          bytes(static_cast<std::size_t>(stride) * static_cast<std::size_t>(rowCount) + 32, UNTOUCHED) {}

    int At(int x, int y) const { return bytes[static_cast<std::size_t>(y * stride + x)]; }
    bool IsUntouched() const { return bytes == Bytes(bytes.size(), UNTOUCHED); }
    bool IsUntouchedOutside() const {
        for (std::size_t i = 0; i < bytes.size(); ++i) {
            const int x = static_cast<int>(i) % stride;
            const int y = static_cast<int>(i) / stride;
            if ((x >= width || y >= height) && bytes[i] != UNTOUCHED)
                return false;
        }
        return true;
    }

    int width, height, stride;
    Bytes bytes;
};

struct I420 {
    I420(int width, int height, int gap = 5)
        : w(width),
          h(height),
          y(width, height, gap),
          u((width + 1) / 2, (height + 1) / 2, gap),
          v((width + 1) / 2, (height + 1) / 2, gap + 2) {}
    int From(IShareFrame* frame) {
        return ShareFrameToI420(frame, y.bytes.data(), y.stride, u.bytes.data(), u.stride, v.bytes.data(),
                                v.stride, w, h);
    }
    bool IsUntouched() const { return y.IsUntouched() && u.IsUntouched() && v.IsUntouched(); }
    int w, h;
    Plane y, u, v;
};

struct Nv12 {
    Nv12(int width, int height, int gap = 5)
        : w(width),
          h(height),
          y(width, height, gap),
          uv((width + 1) / 2 * 2, (height + 1) / 2, gap) {}
    int From(IShareFrame* frame) {
        return ShareFrameToNV12(frame, y.bytes.data(), y.stride, uv.bytes.data(), uv.stride, w, h);
    }
    bool IsUntouched() const { return y.IsUntouched() && uv.IsUntouched(); }
    int w, h;
    Plane y, uv;
};

::testing::AssertionResult IsNear(int sample, double expected, const char* plane, int x, int y) {
    if (std::abs(sample - expected) <= TOLERANCE)
        return ::testing::AssertionSuccess();
    return ::testing::AssertionFailure()
           << plane << " at " << x << "," << y << " is " << sample << " and not " << expected;
}

void ExpectPicture(const I420& planes) {
    for (int y = 0; y < planes.h; ++y) {
        for (int x = 0; x < planes.w; ++x) {
            const Rgb c = ColourAt(x, y);
            ASSERT_TRUE(IsNear(planes.y.At(x, y), YuvOf(c.r, c.g, c.b).y, "y", x, y));
        }
    }
    for (int y = 0; y < (planes.h + 1) / 2; ++y) {
        for (int x = 0; x < (planes.w + 1) / 2; ++x) {
            const Yuv block = BlockAt(x, y, planes.w, planes.h);
            ASSERT_TRUE(IsNear(planes.u.At(x, y), block.u, "u", x, y));
            ASSERT_TRUE(IsNear(planes.v.At(x, y), block.v, "v", x, y));
        }
    }
    EXPECT_TRUE(planes.y.IsUntouchedOutside());
    EXPECT_TRUE(planes.u.IsUntouchedOutside());
    EXPECT_TRUE(planes.v.IsUntouchedOutside());
}

constexpr std::array<TVLSize, 9> SIZES{
    {{16, 8}, {1, 1}, {2, 1}, {1, 2}, {3, 3}, {17, 5}, {64, 2}, {67, 9}, {1027, 3}}};

template <class Planes>
void ExpectRefused(Planes planes, IShareFrame* frame) {
    EXPECT_EQ(planes.From(frame), SHARE_RESULT_INVALID_PARAM);
    EXPECT_TRUE(planes.IsUntouched());
}
void ExpectRefusedByBoth(int width, int height, IShareFrame* frame) {
    ExpectRefused(I420(width, height), frame);
    ExpectRefused(Nv12(width, height), frame);
}

class ThrowingFrame : public CShareFrame {
public:
    SHARE_FRAME_FORMAT GetFrameDataFormat() override { throw std::runtime_error("no"); }
};

} // namespace

TEST(ShareConvert, GivesTheColoursOfEveryFormatInEverySize) {
    for (const Form& form : FORMS) {
        for (const TVLSize size : SIZES) {
            SCOPED_TRACE("format " + std::to_string(form.format) + ", " + std::to_string(size.cx) + "x" +
                         std::to_string(size.cy));
            const auto frame = PaintedFrame(size.cx, size.cy, form);
            I420 planes(size.cx, size.cy);
            ASSERT_EQ(planes.From(frame.get()), SHARE_RESULT_OK);
            ExpectPicture(planes);
        }
    }
}

TEST(ShareConvert, GivesTheSameSamplesInBothForms) {
    for (const Form& form : FORMS) {
        for (const TVLSize size : SIZES) {
            SCOPED_TRACE("format " + std::to_string(form.format) + ", " + std::to_string(size.cx) + "x" +
                         std::to_string(size.cy));
            const auto frame = PaintedFrame(size.cx, size.cy, form);
            I420 planar(size.cx, size.cy);
            Nv12 paired(size.cx, size.cy);
            ASSERT_EQ(planar.From(frame.get()), SHARE_RESULT_OK);
            ASSERT_EQ(paired.From(frame.get()), SHARE_RESULT_OK);
            EXPECT_EQ(paired.y.bytes, planar.y.bytes);
            for (int y = 0; y < planar.u.height; ++y) {
                for (int x = 0; x < planar.u.width; ++x) {
                    ASSERT_EQ(paired.uv.At(2 * x, y), planar.u.At(x, y)) << x << "," << y;
                    ASSERT_EQ(paired.uv.At(2 * x + 1, y), planar.v.At(x, y)) << x << "," << y;
                }
            }
            EXPECT_TRUE(paired.uv.IsUntouchedOutside());
        }
    }
}

TEST(ShareConvert, FollowsTheLinesOfTheFrame) {
    for (const Form& form : FORMS) {
        const auto frame = PaintedFrame(15, 7, form, 15 * form.bytes + 9);
        I420 planes(15, 7);
        ASSERT_EQ(planes.From(frame.get()), SHARE_RESULT_OK);
        ExpectPicture(planes);
    }
}

TEST(ShareConvert, KeepsToTheLimitedRange) {
    const auto frame = NewFrame(2, 2, SHARE_FRAME_FORMAT_RGB);
    for (const auto& [colour, luma] : {std::pair<unsigned char, int>{0, 16}, {255, 235}}) {
        const Bytes pixels(12, colour);
        frame->WriteFrameData(pixels.data(), 12);
        I420 planes(2, 2);
        ASSERT_EQ(planes.From(frame.get()), SHARE_RESULT_OK);
        EXPECT_NEAR(planes.y.At(0, 0), luma, 1);
        EXPECT_NEAR(planes.u.At(0, 0), 128, 1);
        EXPECT_NEAR(planes.v.At(0, 0), 128, 1);
    }
}

TEST(ShareConvert, RefusesWhatIsNoPicture) {
    ExpectRefusedByBoth(4, 4, nullptr);
    ExpectRefusedByBoth(4, 4, NewFrame(4, 4, SHARE_FRAME_FORMAT_NONE).get());
    const auto empty = NewFrame(0, 0, SHARE_FRAME_FORMAT_RGBA);
    Bytes planes(64, UNTOUCHED);
    EXPECT_EQ(ShareFrameToI420(empty.get(), &planes[0], 4, &planes[16], 4, &planes[32], 4, 0, 0),
              SHARE_RESULT_INVALID_PARAM);
    EXPECT_EQ(ShareFrameToNV12(empty.get(), &planes[0], 4, &planes[16], 4, 0, 0), SHARE_RESULT_INVALID_PARAM);
    EXPECT_EQ(planes, Bytes(64, UNTOUCHED));
}

TEST(ShareConvert, RefusesPlanesOfAnotherSizeThanTheFrames) {
    const auto frame = PaintedFrame(4, 4, FORMS[0]);
    for (const TVLSize size : {TVLSize{4, 3}, TVLSize{3, 4}, TVLSize{5, 4}, TVLSize{4, 5}})
        ExpectRefusedByBoth(size.cx, size.cy, frame.get());
}

TEST(ShareConvert, RefusesAFrameWithLessMemoryThanItsGeometryNeeds) {
    const auto frame = NewFrame();
    Bytes memory(4 * 4 * 4 - 1);
    ASSERT_EQ(frame->SetExternalBuf(memory.data(), Length(memory)), 0);
    frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    frame->SetFrameSize(4, 4);
    ExpectRefusedByBoth(4, 4, frame.get());

    const auto shrunk = NewFrame();
    shrunk->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    shrunk->SetFrameLineBytes(12);
    shrunk->SetFrameSize(4, 4); // 48 bytes
    ExpectRefusedByBoth(4, 4, shrunk.get());
    shrunk->Reset(); // the lines are 16 bytes long now, the memory is what it was
    ExpectRefusedByBoth(4, 4, shrunk.get());
}

TEST(ShareConvert, NeedsNoMoreOfTheLastLineThanItsPixels) {
    const auto frame = NewFrame();
    Bytes memory(3 * 20 + 16);
    ASSERT_EQ(frame->SetExternalBuf(memory.data(), Length(memory)), 0);
    frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    frame->SetFrameSize(4, 4);
    ASSERT_EQ(frame->SetFrameLineBytes(20), 0);
    EXPECT_EQ(I420(4, 4).From(frame.get()), SHARE_RESULT_OK);
    EXPECT_EQ(Nv12(4, 4).From(frame.get()), SHARE_RESULT_OK);
}

TEST(ShareConvert, RefusesAStrideOneByteTooShort) {
    const auto frame = PaintedFrame(5, 3, FORMS[0]);
    ASSERT_EQ(I420(5, 3, 0).From(frame.get()), SHARE_RESULT_OK);
    ASSERT_EQ(Nv12(5, 3, 0).From(frame.get()), SHARE_RESULT_OK);
    for (Plane I420::*plane : {&I420::y, &I420::u, &I420::v}) {
        I420 planes(5, 3, 0);
        (planes.*plane).stride = (planes.*plane).width - 1;
        ExpectRefused(planes, frame.get());
    }
    for (Plane Nv12::*plane : {&Nv12::y, &Nv12::uv}) {
        Nv12 planes(5, 3, 0);
        (planes.*plane).stride = (planes.*plane).width - 1;
        ExpectRefused(planes, frame.get());
        (planes.*plane).stride = -(planes.*plane).width;
        ExpectRefused(planes, frame.get());
    }
}

TEST(ShareConvert, RefusesAMissingPlane) {
    const auto frame = PaintedFrame(4, 4, FORMS[0]);
    Bytes a(64, UNTOUCHED);
    unsigned char* const p = a.data();
    EXPECT_EQ(ShareFrameToI420(frame.get(), nullptr, 4, p, 4, p + 32, 4, 4, 4), SHARE_RESULT_INVALID_PARAM);
    EXPECT_EQ(ShareFrameToI420(frame.get(), p, 4, nullptr, 4, p + 32, 4, 4, 4), SHARE_RESULT_INVALID_PARAM);
    EXPECT_EQ(ShareFrameToI420(frame.get(), p, 4, p + 32, 4, nullptr, 4, 4, 4), SHARE_RESULT_INVALID_PARAM);
    EXPECT_EQ(ShareFrameToNV12(frame.get(), nullptr, 4, p, 4, 4, 4), SHARE_RESULT_INVALID_PARAM);
    EXPECT_EQ(ShareFrameToNV12(frame.get(), p, 4, nullptr, 4, 4, 4), SHARE_RESULT_INVALID_PARAM);
    EXPECT_EQ(a, Bytes(64, UNTOUCHED));
}

TEST(ShareConvert, LetsNothingOutThatAClientsFrameThrows) {
    const auto frame = NewFrame<ThrowingFrame>();
    frame->SetFrameSize(4, 4);
    I420 planes(4, 4);
    EXPECT_EQ(planes.From(frame.get()), SHARE_RESULT_FAILED);
    EXPECT_TRUE(planes.IsUntouched());
}
