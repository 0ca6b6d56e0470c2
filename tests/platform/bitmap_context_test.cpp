// SPDX-License-Identifier: Apache-2.0
#include "tests/platform/bitmap_tools.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <memory>
#include <string>

/// Contexts, case by case; long random sequences of the same are in bitmap_context_random_test.

namespace {

using namespace platform;

constexpr float NOT_A_NUMBER = std::numeric_limits<float>::quiet_NaN();
constexpr float ENDLESS = std::numeric_limits<float>::infinity();
constexpr float HUGE_LENGTH = std::numeric_limits<float>::max();

constexpr Colour RED{255, 0, 0, 255};
constexpr Colour NOTHING{0, 0, 0, 0};

void Fill(Canvas& canvas, const CGRect& rect) {
    CGContextSetRGBFillColor(canvas.Get(), 1, 0, 0, 1);
    CGContextFillRect(canvas.Get(), rect);
}

/// How many pixels are red, and the smallest box around them, as text.
std::string RedOf(const Canvas& canvas) {
    int count = 0;
    int left = 1 << 30, top = 1 << 30, right = 0, bottom = 0;
    for (int y = 0; y < canvas.height; ++y) {
        for (int x = 0; x < canvas.width; ++x) {
            if (canvas.At(x, y) != RED)
                continue;
            ++count;
            left = std::min(left, x);
            top = std::min(top, y);
            right = std::max(right, x + 1);
            bottom = std::max(bottom, y + 1);
        }
    }
    if (count == 0)
        return "none";
    return std::to_string(left) + "," + std::to_string(top) + " " + std::to_string(right - left) + "x" +
           std::to_string(bottom - top) + (count == (right - left) * (bottom - top) ? "" : " with holes");
}

std::string RedAfterFill(const CGRect& rect) {
    Canvas canvas(10, 8, kCGImageAlphaPremultipliedLast);
    Fill(canvas, rect);
    return RedOf(canvas);
}

} // namespace

// ---- Making

TEST(CGBitmapContext, IsMadeOnMemoryThatJustHoldsItsLastPixel) {
    Bytes memory(100);
    // Two rows of three pixels, sixteen bytes apart.
    EXPECT_NE(CGBitmapContextCreate(memory.data(), 28, 3, 2, 8, 16, kCGImageAlphaPremultipliedLast), nullptr);
    EXPECT_EQ(CGBitmapContextCreate(memory.data(), 27, 3, 2, 8, 16, kCGImageAlphaPremultipliedLast), nullptr);
    EXPECT_NE(CGBitmapContextCreate(memory.data(), 25, 3, 2, 8, 16, kCGImageAlphaNone), nullptr);
    EXPECT_EQ(CGBitmapContextCreate(memory.data(), 24, 3, 2, 8, 16, kCGImageAlphaNone), nullptr);
}

TEST(CGBitmapContext, IsRefusedForRowsTooShortForTheirPixels) {
    Bytes memory(100);
    for (const unsigned info : ALL_INFOS) {
        const int needed = info == kCGImageAlphaNone ? 9 : 12;
        EXPECT_NE(CGBitmapContextCreate(memory.data(), 100, 3, 2, 8, needed, info), nullptr) << info;
        EXPECT_EQ(CGBitmapContextCreate(memory.data(), 100, 3, 2, 8, needed - 1, info), nullptr) << info;
        EXPECT_EQ(CGBitmapContextCreate(memory.data(), 100, 3, 2, 8, 0, info), nullptr) << info;
        EXPECT_EQ(CGBitmapContextCreate(memory.data(), 100, 3, 2, 8, -16, info), nullptr) << info;
    }
}

TEST(CGBitmapContext, IsRefusedForAnythingButKnownPixelsOnRealMemory) {
    Bytes memory(100);
    const auto create = [&](std::uint8_t* data, int width, int height, int bits, unsigned info) {
        return CGBitmapContextCreate(data, 100, width, height, bits, 12, info) != nullptr;
    };
    EXPECT_TRUE(create(memory.data(), 3, 2, 8, 5));
    EXPECT_FALSE(create(nullptr, 3, 2, 8, 5));
    EXPECT_FALSE(create(memory.data(), 0, 2, 8, 5));
    EXPECT_FALSE(create(memory.data(), 3, 0, 8, 5));
    EXPECT_FALSE(create(memory.data(), -3, 2, 8, 5));
    EXPECT_FALSE(create(memory.data(), 3, -2, 8, 5));
    EXPECT_FALSE(create(memory.data(), 3, 2, 16, 5));
    for (const unsigned info : {3u, 4u, 6u, 7u, 8194u, ~0u})
        EXPECT_FALSE(create(memory.data(), 3, 2, 8, info)) << info;
}

TEST(CGBitmapContext, IsRefusedForSizesThatNoMemoryHas) {
    Bytes memory(100);
    constexpr int most = std::numeric_limits<int>::max();
    EXPECT_EQ(CGBitmapContextCreate(memory.data(), 100, most, most, 8, most, 5), nullptr);
    EXPECT_EQ(CGBitmapContextCreate(memory.data(), 100, 1, most, 8, most, 5), nullptr);
}

TEST(CGBitmapContext, TellsWhatItWasMadeWith) {
    Canvas canvas(5, 3, kCGImageAlphaPremultipliedFirst, 4);
    EXPECT_EQ(CGBitmapContextGetWidth(canvas.Get()), 5);
    EXPECT_EQ(CGBitmapContextGetHeight(canvas.Get()), 3);
    EXPECT_EQ(CGBitmapContextGetBytesPerRow(canvas.Get()), 24);
    EXPECT_EQ(CGBitmapContextGetData(canvas.Get()), canvas.memory.data());
}

TEST(CGBitmapContext, IsPaintedOnByNobodyWhenItIsNull) {
    const CGImageRef image = MakeImage(1, 1, CGPixelLayout::RGBA, [](int, int) { return RED; });
    const CGRect rect{{0, 0}, {1, 1}};
    CGContextSetRGBFillColor(nullptr, 1, 1, 1, 1);
    CGContextSetInterpolationQuality(nullptr, kCGInterpolationHigh);
    CGContextFillRect(nullptr, rect);
    CGContextFillRects(nullptr, &rect, 1);
    CGContextClearRect(nullptr, rect);
    CGContextDrawImage(nullptr, rect, image.get());
    EXPECT_EQ(CGBitmapContextGetWidth(nullptr), 0);
    EXPECT_EQ(CGBitmapContextGetHeight(nullptr), 0);
    EXPECT_EQ(CGBitmapContextGetBytesPerRow(nullptr), 0);
    EXPECT_EQ(CGBitmapContextGetData(nullptr), nullptr);
    EXPECT_EQ(CGBitmapContextCreateImage(nullptr), nullptr);
}

// ---- Filling

TEST(CGContextFill, CountsFromTheBottomOfAPictureWhoseFirstRowIsAtTheTop) {
    EXPECT_EQ(RedAfterFill({{1, 0}, {3, 2}}), "1,6 3x2");
    EXPECT_EQ(RedAfterFill({{0, 7}, {10, 1}}), "0,0 10x1");
}

TEST(CGContextFill, RoundsToWholePixels) {
    EXPECT_EQ(RedAfterFill({{1.4F, 2.4F}, {2, 3}}), "1,3 2x3");
    EXPECT_EQ(RedAfterFill({{1.6F, 2.6F}, {2, 3}}), "2,2 2x3");
    EXPECT_EQ(RedAfterFill({{1.5F, 1.5F}, {2, 2}}), "2,4 2x2");
}

TEST(CGContextFill, CoversAtLeastOnePixel) {
    EXPECT_EQ(RedAfterFill({{2.6F, 3.1F}, {0.3F, 0.2F}}), "2,4 1x1");
    EXPECT_EQ(RedAfterFill({{2, 3}, {0.001F, 4}}), "2,1 1x4");
}

TEST(CGContextFill, CoversNothingWithoutAnArea) {
    EXPECT_EQ(RedAfterFill({{2, 3}, {0, 4}}), "none");
    EXPECT_EQ(RedAfterFill({{2, 3}, {4, 0}}), "none");
}

TEST(CGContextFill, TakesANegativeLengthFromTheOtherSide) {
    EXPECT_EQ(RedAfterFill({{4, 5}, {-3, -2}}), "1,3 3x2");
}

TEST(CGContextFill, LeavesOutWhatLiesOutside) {
    EXPECT_EQ(RedAfterFill({{-5, -5}, {7, 8}}), "0,5 2x3");
    EXPECT_EQ(RedAfterFill({{8, 6}, {100, 100}}), "8,0 2x2");
    EXPECT_EQ(RedAfterFill({{10, 0}, {5, 5}}), "none");
    EXPECT_EQ(RedAfterFill({{-5, 0}, {5, 5}}), "none");
    EXPECT_EQ(RedAfterFill({{0, 8}, {5, 5}}), "none");
}

TEST(CGContextFill, StandsAnyRectangle) {
    EXPECT_EQ(RedAfterFill({{NOT_A_NUMBER, 0}, {5, 5}}), "none");
    EXPECT_EQ(RedAfterFill({{0, 0}, {5, NOT_A_NUMBER}}), "none");
    EXPECT_EQ(RedAfterFill({{-ENDLESS, 0}, {ENDLESS, 5}}), "none");
    EXPECT_EQ(RedAfterFill({{-HUGE_LENGTH, -HUGE_LENGTH}, {HUGE_LENGTH, HUGE_LENGTH}}), "none")
        << "it ends where the context begins";
    EXPECT_EQ(RedAfterFill({{-HUGE_LENGTH / 2, -HUGE_LENGTH / 2}, {HUGE_LENGTH, HUGE_LENGTH}}), "0,0 10x8");
    EXPECT_EQ(RedAfterFill({{4, 2}, {ENDLESS, HUGE_LENGTH}}), "4,0 6x6");
    EXPECT_EQ(RedAfterFill({{HUGE_LENGTH, 0}, {HUGE_LENGTH, 5}}), "none");
}

TEST(CGContextFill, SetsTheByteWithoutMeaningAndTheAlpha) {
    for (const unsigned info : {1u, 2u, 5u}) {
        Canvas canvas(3, 2, info);
        Fill(canvas, {{0, 0}, {3, 2}});
        EXPECT_EQ(canvas.At(2, 1), RED) << info;
    }
}

TEST(CGContextFill, LaysATranslucentColourOver) {
    for (const unsigned info : ALL_INFOS) {
        Canvas canvas(300, 2, info);
        CGContextSetRGBFillColor(canvas.Get(), 0, 0, 1, 1);
        CGContextFillRect(canvas.Get(), {{0, 0}, {300, 2}});
        CGContextSetRGBFillColor(canvas.Get(), 1, 0, 0, 0.4F);
        CGContextFillRect(canvas.Get(), {{0, 0}, {300, 1}});
        EXPECT_EQ(canvas.At(299, 0), (Colour{0, 0, 255, 255})) << info;
        EXPECT_EQ(canvas.At(0, 1), (Colour{102, 0, 153, 255})) << info;
        EXPECT_EQ(canvas.At(299, 1), (Colour{102, 0, 153, 255})) << info;
    }
}

TEST(CGContextFill, LeavesItsAlphaOnEmptyPixels) {
    Canvas canvas(1, 1, kCGImageAlphaPremultipliedFirst);
    CGContextSetRGBFillColor(canvas.Get(), 1, 0.5F, 0, 0.5F);
    CGContextFillRect(canvas.Get(), {{0, 0}, {1, 1}});
    EXPECT_EQ(canvas.At(0, 0), (Colour{128, 64, 0, 128}));
}

TEST(CGContextFill, HoldsComponentsWithinTheirRange) {
    Canvas canvas(1, 1, kCGImageAlphaPremultipliedLast);
    CGContextSetRGBFillColor(canvas.Get(), 7, -1, NOT_A_NUMBER, ENDLESS);
    CGContextFillRect(canvas.Get(), {{0, 0}, {1, 1}});
    EXPECT_EQ(canvas.At(0, 0), RED);
}

TEST(CGContextFill, StartsWithOpaqueBlack) {
    Canvas canvas(1, 1, kCGImageAlphaPremultipliedFirst);
    CGContextFillRect(canvas.Get(), {{0, 0}, {1, 1}});
    EXPECT_EQ(canvas.At(0, 0), (Colour{0, 0, 0, 255}));
}

TEST(CGContextFill, TakesManyRectanglesAtOnce) {
    Canvas canvas(10, 8, kCGImageAlphaNoneSkipLast);
    CGContextSetRGBFillColor(canvas.Get(), 1, 0, 0, 1);
    const CGRect rects[] = {
        {{0, 0}, {1, 1}}, {{3, 3}, {2, 2}}, {{3, 3}, {-1, 1}}, {{NOT_A_NUMBER, 0}, {9, 9}}};
    CGContextFillRects(canvas.Get(), rects, 4);
    for (int y = 0; y < 8; ++y) {
        for (int x = 0; x < 10; ++x) {
            const int up = 7 - y;
            const bool isRed =
                (x == 0 && up == 0) || (x >= 3 && x < 5 && up >= 3 && up < 5) || (x == 2 && up == 3);
            EXPECT_EQ(canvas.At(x, y), isRed ? RED : NOTHING) << x << "," << y;
        }
    }
    CGContextFillRects(canvas.Get(), nullptr, 4);
    CGContextFillRects(canvas.Get(), rects, 0);
}

TEST(CGContextFill, LeavesTheEndsOfRowsAlone) {
    for (const unsigned info : ALL_INFOS) {
        Canvas canvas(3, 4, info, 5);
        std::fill(canvas.memory.begin(), canvas.memory.end(), std::uint8_t{0x77});
        Fill(canvas, {{-1, -1}, {9, 9}});
        const std::size_t rowBytes = canvas.memory.size() / 4;
        for (std::size_t y = 0; y < 4; ++y) {
            for (std::size_t i = rowBytes - 5; i < rowBytes; ++i)
                EXPECT_EQ(canvas.memory[y * rowBytes + i], 0x77) << info;
        }
    }
}

TEST(CGContextClear, SetsAllBytesToZero) {
    for (const unsigned info : ALL_INFOS) {
        Canvas canvas(4, 4, info);
        std::fill(canvas.memory.begin(), canvas.memory.end(), std::uint8_t{0x77});
        CGContextClearRect(canvas.Get(), {{1, 0}, {2, 1}});
        const std::size_t pixelBytes = canvas.memory.size() / 16;
        for (std::size_t i = 0; i < canvas.memory.size(); ++i) {
            const std::size_t pixel = i / pixelBytes;
            EXPECT_EQ(canvas.memory[i], pixel == 13 || pixel == 14 ? 0 : 0x77) << info << " byte " << i;
        }
        CGContextClearRect(canvas.Get(), {{NOT_A_NUMBER, 0}, {9, 9}});
        EXPECT_EQ(canvas.memory[0], 0x77);
    }
}

// ---- Drawing

TEST(CGContextDraw, PutsAnImageTheRightWayUp) {
    const CGImageRef image = MakeImage(2, 3, CGPixelLayout::BGRX, [](int x, int y) {
        return Colour{x * 100, y * 100, 7, 0};
    });
    Canvas canvas(4, 5, kCGImageAlphaNoneSkipLast);
    CGContextDrawImage(canvas.Get(), {{1, 1}, {2, 3}}, image.get());
    for (int y = 0; y < 5; ++y) {
        for (int x = 0; x < 4; ++x) {
            const bool inside = x >= 1 && x < 3 && y >= 1 && y < 4;
            EXPECT_EQ(canvas.At(x, y), inside ? (Colour{(x - 1) * 100, (y - 1) * 100, 7, 255}) : NOTHING);
        }
    }
}

TEST(CGContextDraw, TurnsEveryLayoutIntoEveryOther) {
    const auto colourAt = [](int x, int) { return Colour{x % 64 * 4, 40, 80, 255}; };
    for (const CGPixelLayout layout : ALL_LAYOUTS) {
        const CGImageRef image = MakeImage(301, 1, layout, colourAt);
        for (const unsigned info : ALL_INFOS) {
            Canvas canvas(301, 1, info);
            CGContextDrawImage(canvas.Get(), {{0, 0}, {301, 1}}, image.get());
            for (const int x : {0, 1, 15, 16, 255, 256, 300})
                EXPECT_EQ(canvas.At(x, 0), colourAt(x, 0)) << static_cast<int>(layout) << " to " << info;
        }
    }
}

TEST(CGContextDraw, TakesAnImageWithoutAlphaAsOpaqueWhateverItsFourthByte) {
    const CGImageRef image = MakeImage(1, 1, CGPixelLayout::BGRX, [](int, int) {
        return Colour{10, 20, 30, 0};
    });
    Canvas canvas(1, 1, kCGImageAlphaPremultipliedFirst);
    CGContextDrawImage(canvas.Get(), {{0, 0}, {1, 1}}, image.get());
    EXPECT_EQ(canvas.At(0, 0), (Colour{10, 20, 30, 255}));
}

TEST(CGContextDraw, LaysPremultipliedPixelsOver) {
    const CGImageRef image = MakeImage(1, 1, CGPixelLayout::BGRA, [](int, int) {
        return Colour{100, 50, 0, 128};
    });
    for (const unsigned info : ALL_INFOS) {
        Canvas canvas(1, 1, info);
        CGContextSetRGBFillColor(canvas.Get(), 0, 1, 1, 1);
        CGContextFillRect(canvas.Get(), {{0, 0}, {1, 1}});
        CGContextDrawImage(canvas.Get(), {{0, 0}, {1, 1}}, image.get());
        EXPECT_EQ(canvas.At(0, 0), (Colour{100, 50 + 127, 127, 255})) << info;
    }
    Canvas empty(1, 1, kCGImageAlphaPremultipliedLast);
    CGContextDrawImage(empty.Get(), {{0, 0}, {1, 1}}, image.get());
    EXPECT_EQ(empty.At(0, 0), (Colour{100, 50, 0, 128}));
}

TEST(CGContextDraw, StandsColoursAboveTheirAlpha) {
    const CGImageRef image = MakeImage(1, 1, CGPixelLayout::RGBA, [](int, int) {
        return Colour{255, 200, 1, 10};
    });
    Canvas canvas(1, 1, kCGImageAlphaPremultipliedLast);
    CGContextSetRGBFillColor(canvas.Get(), 1, 1, 1, 1);
    CGContextFillRect(canvas.Get(), {{0, 0}, {1, 1}});
    CGContextDrawImage(canvas.Get(), {{0, 0}, {1, 1}}, image.get());
    EXPECT_EQ(canvas.At(0, 0), (Colour{255, 255, 246, 255}));
}

TEST(CGContextDraw, ClipsAnImageWithoutMovingIt) {
    const CGImageRef image = MakeImage(16, 16, CGPixelLayout::RGBA, [](int x, int y) {
        return Colour{x, y, 0, 255};
    });
    Canvas canvas(10, 10, kCGImageAlphaPremultipliedLast);
    CGContextDrawImage(canvas.Get(), {{-8, -3}, {16, 16}}, image.get());
    EXPECT_EQ(canvas.At(0, 0), (Colour{8, 3, 0, 255}));
    EXPECT_EQ(canvas.At(7, 9), (Colour{15, 12, 0, 255}));
    EXPECT_EQ(canvas.At(8, 9), NOTHING);
}

TEST(CGContextDraw, HalvesByTheMeanOfFour) {
    const CGImageRef image = MakeImage(4, 4, CGPixelLayout::BGRX, [](int x, int y) {
        return x < 2 && y < 2 ? Colour{x * 40 + y * 100, 8, 200, 0} : Colour{0, 0, 0, 0};
    });
    for (const unsigned info : ALL_INFOS) {
        Canvas canvas(2, 2, info);
        CGContextSetInterpolationQuality(canvas.Get(), kCGInterpolationHigh);
        CGContextDrawImage(canvas.Get(), {{0, 0}, {2, 2}}, image.get());
        EXPECT_EQ(canvas.At(0, 0), (Colour{70, 8, 200, 255})) << info;
        EXPECT_EQ(canvas.At(1, 1), (Colour{0, 0, 0, 255})) << info;
    }
}

TEST(CGContextDraw, LeavesOutNoPixelWhenItScalesFarDown) {
    // One bright pixel of each block of 3 by 3, which is not the middle one.
    const CGImageRef image = MakeImage(36, 36, CGPixelLayout::BGRX, [](int x, int y) {
        return x % 3 == 0 && y % 3 == 2 ? Colour{180, 90, 0, 0} : Colour{0, 0, 0, 0};
    });
    Canvas high(12, 12, kCGImageAlphaNoneSkipLast);
    CGContextSetInterpolationQuality(high.Get(), kCGInterpolationHigh);
    CGContextDrawImage(high.Get(), {{0, 0}, {12, 12}}, image.get());
    Canvas plain(12, 12, kCGImageAlphaNoneSkipLast);
    CGContextDrawImage(plain.Get(), {{0, 0}, {12, 12}}, image.get());
    for (int y = 0; y < 12; ++y) {
        for (int x = 0; x < 12; ++x) {
            EXPECT_EQ(high.At(x, y), (Colour{20, 10, 0, 255}));
            EXPECT_EQ(plain.At(x, y), (Colour{0, 0, 0, 255}));
        }
    }
}

TEST(CGContextDraw, ScalesTheAxesApart) {
    // Stripes: wide ones survive, the other axis is averaged.
    const CGImageRef image = MakeImage(4, 40, CGPixelLayout::RGBX, [](int x, int y) {
        return Colour{x < 2 ? 255 : 0, y % 4 == 0 ? 200 : 0, 0, 0};
    });
    Canvas canvas(8, 10, kCGImageAlphaNoneSkipLast);
    CGContextSetInterpolationQuality(canvas.Get(), kCGInterpolationHigh);
    CGContextDrawImage(canvas.Get(), {{0, 0}, {8, 10}}, image.get());
    for (int y = 0; y < 10; ++y) {
        EXPECT_EQ(canvas.At(0, y), (Colour{255, 50, 0, 255}));
        EXPECT_EQ(canvas.At(7, y), (Colour{0, 50, 0, 255}));
    }
}

TEST(CGContextDraw, KeepsAPlainColourAtEveryScale) {
    const Colour colour{201, 77, 3, 255};
    for (const CGPixelLayout layout : {CGPixelLayout::RGBX, CGPixelLayout::BGRA, CGPixelLayout::RGB}) {
        const CGImageRef image = MakeImage(37, 23, layout, [&](int, int) { return colour; });
        for (int side = 1; side < 90; side += 4) {
            Canvas canvas(90, 90, kCGImageAlphaPremultipliedLast);
            CGContextSetInterpolationQuality(canvas.Get(), kCGInterpolationHigh);
            CGContextDrawImage(canvas.Get(),
                               {{0, 0}, {static_cast<float>(side), static_cast<float>(90 - side)}},
                               image.get());
            for (const int x : {0, side / 2, side - 1}) {
                for (const int up : {0, (90 - side) / 2, 89 - side})
                    ASSERT_EQ(canvas.At(x, 89 - up), colour) << side << " at " << x << "," << up;
            }
        }
    }
}

TEST(CGContextDraw, ShrinksToOnePixelAndNeverToNone) {
    const CGImageRef image = MakeImage(8, 8, CGPixelLayout::RGBX, [](int, int) { return RED; });
    Canvas canvas(10, 8, kCGImageAlphaNoneSkipLast);
    CGContextDrawImage(canvas.Get(), {{4.1F, 3.2F}, {0.2F, 0.1F}}, image.get());
    EXPECT_EQ(RedOf(canvas), "4,4 1x1");
}

TEST(CGContextDraw, StandsAnyRectangle) {
    const CGImageRef image = MakeImage(3, 3, CGPixelLayout::RGBX, [](int, int) { return RED; });
    const auto drawn = [&](const CGRect& rect) {
        Canvas canvas(10, 8, kCGImageAlphaNoneSkipLast);
        CGContextSetInterpolationQuality(canvas.Get(), kCGInterpolationHigh);
        CGContextDrawImage(canvas.Get(), rect, image.get());
        return RedOf(canvas);
    };
    EXPECT_EQ(drawn({{NOT_A_NUMBER, 0}, {5, 5}}), "none");
    EXPECT_EQ(drawn({{0, 0}, {5, NOT_A_NUMBER}}), "none");
    EXPECT_EQ(drawn({{0, 0}, {ENDLESS, 5}}), "none");
    EXPECT_EQ(drawn({{-ENDLESS, 0}, {5, 5}}), "none");
    EXPECT_EQ(drawn({{-HUGE_LENGTH / 2, -HUGE_LENGTH / 2}, {HUGE_LENGTH, HUGE_LENGTH}}), "0,0 10x8");
    EXPECT_EQ(drawn({{-1e9F, 2}, {2e9F, 1}}), "0,5 10x1");
    EXPECT_EQ(drawn({{2, 2}, {0, 5}}), "none");
    EXPECT_EQ(drawn({{6, 6}, {-4, -4}}), "2,2 4x4");
}

TEST(CGContextDraw, DrawsNothingForNull) {
    Canvas canvas(10, 8, kCGImageAlphaNoneSkipLast);
    CGContextDrawImage(canvas.Get(), {{0, 0}, {5, 5}}, nullptr);
    EXPECT_EQ(RedOf(canvas), "none");
    EXPECT_EQ(canvas.memory, Bytes(canvas.memory.size()));
}

TEST(CGContextDraw, TouchesNoByteBesideItsTwoPictures) {
    for (const LonelyMemory::At side : {LonelyMemory::At::Start, LonelyMemory::At::End}) {
        for (const int from : {1, 2, 3, 7, 8, 33, 64}) {
            for (int to = 1; to < 80; to += 3) {
                const auto memory =
                    std::make_shared<LonelyMemory>(static_cast<std::size_t>(from * from * 4), side);
                const LonelyMemory target(static_cast<std::size_t>(to * to * 4), side);
                for (const CGPixelLayout layout : {CGPixelLayout::BGRX, CGPixelLayout::BGRA}) {
                    const CGImageRef image = CGImageCreate(from, from, static_cast<std::size_t>(from * 4),
                                                           layout, memory->Data(), memory);
                    const CGContextRef context =
                        CGBitmapContextCreate(target.Data(), static_cast<std::size_t>(to * to * 4), to, to, 8,
                                              to * 4, kCGImageAlphaNoneSkipLast);
                    CGContextSetInterpolationQuality(context.get(), kCGInterpolationHigh);
                    const float length = static_cast<float>(to);
                    CGContextDrawImage(context.get(), {{0, 0}, {length, length}}, image.get());
                    CGContextDrawImage(context.get(), {{-3, -2}, {length, length}}, image.get());
                    CGContextDrawImage(context.get(), {{0, 0}, {length, 1}}, image.get());
                    EXPECT_EQ(target.Data()[to * to * 4 - 1], 255);
                }
            }
        }
    }
}
