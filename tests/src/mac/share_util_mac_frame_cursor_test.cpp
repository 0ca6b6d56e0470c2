// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_util_mac.h"
#include "tests/src/share_frame_tools.h"
#include "tests/src/share_region_tools.h"
#include "tests/support/engine_bench.h"
#include "tests/support/fake_window_server.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <limits>
#include <memory>
#include <tuple>
#include <utility>
#include <vector>

/// The system's cursor in a context.

namespace {

using platform::CGPoint;

constexpr int SIDE = 64;

/// One representation: so many pixels of one shade, opaque.
platform::PicturePtr Picture(int width, int height, float scale, unsigned char shade) {
    const auto pixels = std::make_shared<Bytes>();
    for (int i = 0; i < width * height; ++i)
        pixels->insert(pixels->end(), {shade, 0, 0, 255});
    auto picture = std::make_shared<platform::Picture>();
    picture->width = width;
    picture->height = height;
    picture->stride = static_cast<std::size_t>(width) * 4;
    picture->format = platform::PixelFormat::RGBA;
    picture->pixels = pixels->data();
    picture->scale = scale;
    picture->memory = pixels;
    return picture;
}

class CursorDrawing : public testing::Test {
protected:
    CursorDrawing()
        : pixels(SIDE * SIDE * 4),
          context(platform::CGBitmapContextCreate(pixels.data(), pixels.size(), SIDE, SIDE, 8, SIDE * 4,
                                                  platform::kCGImageAlphaPremultipliedLast)) {}

    void SetCursor(CGPoint hotSpot, std::vector<platform::PicturePtr> representations) {
        auto cursor = std::make_shared<platform::CursorImage>();
        cursor->serial = ++m_serial;
        cursor->hotSpot = hotSpot;
        cursor->representations = std::move(representations);
        server->SetCursor(cursor);
    }

    bool Draw(CGPoint position, float scale) {
        std::fill(pixels.begin(), pixels.end(), static_cast<unsigned char>(0));
        return ShareUtilMac::CaptureCursorToCGContext(context.get(), position, scale);
    }

    /// Where the cursor stands, from the top left; `shade` is that of all its pixels.
    TVLRect Drawn(unsigned char shade) const {
        TVLRect box{SIDE, SIDE, 0, 0};
        for (int y = 0; y < SIDE; ++y) {
            for (int x = 0; x < SIDE; ++x) {
                const unsigned char* const pixel = &pixels[static_cast<std::size_t>(y * SIDE + x) * 4];
                if (pixel[3] == 0)
                    continue;
                EXPECT_EQ(pixel[0], shade) << x << "," << y;
                box = {std::min(box.left, x), std::min(box.top, y), std::max(box.right, x + 1),
                       std::max(box.bottom, y + 1)};
            }
        }
        return box;
    }

    CFakeWindowServerScope server;
    Bytes pixels;
    platform::CGContextRef context;

private:
    std::uint64_t m_serial = 0;
};

} // namespace

TEST_F(CursorDrawing, PutsTheHotSpotAtThePosition) {
    SetCursor({3, 2}, {Picture(8, 6, 1, 100)});
    EXPECT_TRUE(Draw({20, 10}, 1));
    EXPECT_EQ(Drawn(100), (TVLRect{17, 8, 25, 14}));
}

TEST_F(CursorDrawing, CutsTheCursorOffAtTheEdges) {
    SetCursor({3, 2}, {Picture(8, 6, 1, 100)});
    EXPECT_TRUE(Draw({0, 63}, 1));
    EXPECT_EQ(Drawn(100), (TVLRect{0, 61, 5, 64}));
    EXPECT_TRUE(Draw({200, 10}, 1));
    EXPECT_EQ(Drawn(100), (TVLRect{SIDE, SIDE, 0, 0}));
}

TEST_F(CursorDrawing, ScalesTheImageAndItsHotSpot) {
    SetCursor({3, 2}, {Picture(8, 6, 1, 100)});
    EXPECT_TRUE(Draw({20, 10}, 2));
    EXPECT_EQ(Drawn(100), (TVLRect{14, 6, 30, 18}));
}

TEST_F(CursorDrawing, ScalesTheHotSpotByTheScaleOfTheContextAlsoForAFinerRepresentation) {
    SetCursor({3, 2}, {Picture(8, 6, 1, 100), Picture(16, 12, 2, 200)});
    EXPECT_TRUE(Draw({20, 10}, 2));
    EXPECT_EQ(Drawn(200), (TVLRect{14, 6, 30, 18})) << "16 pixels drawn 1:1, 3 points being 6 of them";
}

TEST_F(CursorDrawing, TakesTheRepresentationNearestToTheScale) {
    SetCursor({0, 0}, {Picture(8, 8, 1, 100), Picture(16, 16, 2, 200), Picture(24, 24, 3, 250)});
    for (const auto& [scale, shade, side] : {std::tuple(0.5F, 100, 4), std::tuple(1.0F, 100, 8),
                                             std::tuple(1.75F, 200, 14), std::tuple(4.0F, 250, 32)}) {
        EXPECT_TRUE(Draw({0, 0}, scale));
        EXPECT_EQ(Drawn(static_cast<unsigned char>(shade)), (TVLRect{0, 0, side, side})) << scale;
    }
}

TEST_F(CursorDrawing, TakesTheFirstOfTwoThatAreEquallyNear) {
    SetCursor({0, 0}, {Picture(8, 8, 1, 100), Picture(16, 16, 2, 200)});
    EXPECT_TRUE(Draw({0, 0}, 1.5F));
    EXPECT_EQ(Drawn(100), (TVLRect{0, 0, 12, 12}));
}

TEST_F(CursorDrawing, TakesTheImageItselfWhenNoRepresentationIsAnywhereNear) {
    // Far from every scale, the image stands for its points.
    SetCursor({0, 0}, {Picture(2, 2, 1, 100), Picture(4, 4, 2, 200)});
    EXPECT_TRUE(Draw({0, 0}, 150));
    EXPECT_EQ(Drawn(100), (TVLRect{0, 0, SIDE, SIDE}));
}

TEST_F(CursorDrawing, StandsScalesAndPositionsThatAreNoNumbers) {
    constexpr float NAN_VALUE = std::numeric_limits<float>::quiet_NaN();
    SetCursor({3, 2}, {Picture(8, 6, 1, 100)});
    EXPECT_TRUE(Draw({NAN_VALUE, 0}, 1));
    EXPECT_TRUE(Draw({0, 0}, NAN_VALUE));
    EXPECT_TRUE(Draw({0, 0}, 0));
    EXPECT_TRUE(Draw({1e30F, -1e30F}, 1e30F));
    EXPECT_TRUE(Draw({0, 0}, -1));
}

TEST_F(CursorDrawing, FailsWithoutAContextTracedEachTwoHundredTimes) {
    if (!IsOnlyTestOfProcess())
        GTEST_SKIP() << "sites count for the life of a process, and this is not its only test";
    SetCursor({0, 0}, {Picture(8, 8, 1, 100)});
    const CTraceLog trace;
    for (int i = 1; i <= 401; ++i) {
        EXPECT_FALSE(ShareUtilMac::CaptureCursorToCGContext(nullptr, {0, 0}, 1));
        EXPECT_EQ(trace.Lines().size(), i <= 200 ? 1u : i <= 400 ? 2u : 3u) << i;
    }
    EXPECT_TRUE(IsLineAt(trace.Lines()[1], Error("CaptureCursorToCGContext cgContextRef is nil"),
                         "src/mac/share_util_mac_frame"));
}

TEST_F(CursorDrawing, FailsWithoutACursorTracedEachTwoHundredTimes) {
    if (!IsOnlyTestOfProcess())
        GTEST_SKIP() << "sites count for the life of a process, and this is not its only test";
    const CTraceLog trace;
    EXPECT_FALSE(ShareUtilMac::CaptureCursorToCGContext(nullptr, {0, 0}, 1));
    for (int i = 1; i <= 401; ++i) {
        EXPECT_FALSE(Draw({0, 0}, 1));
        EXPECT_EQ(trace.Lines().size(), 1u + (i <= 200 ? 1u : i <= 400 ? 2u : 3u)) << i;
    }
    EXPECT_TRUE(IsLineAt(trace.Lines()[1], Error("CaptureCursorToCGContext sysCursor is nil"),
                         "src/mac/share_util_mac_frame"));
}
