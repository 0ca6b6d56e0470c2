// SPDX-License-Identifier: Apache-2.0
#include "platform/bitmap_context.h"

#include "tests/platform/bitmap_tools.h"

#include <gtest/gtest.h>

#include <cmath>

// How much of images shows, and where painting is allowed.

using namespace platform;

namespace {

CGRect Rect(float x, float y, float width, float height) {
    return {{x, y}, {width, height}};
}

CGImageRef Plain(int width, int height, CGPixelLayout layout, Colour colour) {
    return MakeImage(width, height, layout, [colour](int, int) { return colour; });
}

void FillWhite(Canvas& canvas) {
    CGContextSetRGBFillColor(canvas.Get(), 1, 1, 1, 1);
    CGContextFillRect(canvas.Get(),
                      Rect(0, 0, static_cast<float>(canvas.width), static_cast<float>(canvas.height)));
}

} // namespace

TEST(BitmapContextAlpha, FadesImagesOfEveryLayoutOnEveryCanvas) {
    for (const unsigned info : ALL_INFOS) {
        for (const CGPixelLayout layout : ALL_LAYOUTS) {
            for (const int size : {4, 7}) { // as it is, and scaled
                Canvas canvas(4, 4, info);
                FillWhite(canvas);
                CGContextSetAlpha(canvas.Get(), 0.5F);
                EXPECT_TRUE(CGContextDrawImage(canvas.Get(), Rect(0, 0, 4, 4),
                                               Plain(size, size, layout, {200, 0, 100, 255}).get()));
                const Colour at = canvas.At(1, 1);
                EXPECT_NEAR(at.red, 227, 2) << info << " " << static_cast<int>(layout);
                EXPECT_NEAR(at.green, 127, 2) << info << " " << static_cast<int>(layout);
                EXPECT_NEAR(at.blue, 177, 2) << info << " " << static_cast<int>(layout);
                EXPECT_EQ(at.alpha, 255);
            }
        }
    }
}

TEST(BitmapContextAlpha, ComesOnTopOfTheImagesOwn) {
    Canvas canvas(2, 2, kCGImageAlphaPremultipliedLast);
    CGContextSetAlpha(canvas.Get(), 0.5F);
    CGContextDrawImage(canvas.Get(), Rect(0, 0, 2, 2),
                       Plain(2, 2, CGPixelLayout::BGRA, {100, 0, 0, 128}).get());
    EXPECT_EQ(canvas.At(0, 0), (Colour{50, 0, 0, 64}));
}

TEST(BitmapContextAlpha, IsHeldBetweenNothingAndAll) {
    Canvas canvas(2, 2, kCGImageAlphaPremultipliedLast);
    const CGImageRef image = Plain(2, 2, CGPixelLayout::RGBX, {9, 9, 9, 255});
    for (const float none : {0.0F, -1.0F, std::nanf("")}) {
        CGContextSetAlpha(canvas.Get(), none);
        EXPECT_TRUE(CGContextDrawImage(canvas.Get(), Rect(0, 0, 2, 2), image.get()));
        EXPECT_EQ(canvas.At(0, 0), (Colour{0, 0, 0, 0}));
    }
    CGContextSetAlpha(canvas.Get(), 7);
    CGContextDrawImage(canvas.Get(), Rect(0, 0, 2, 2), image.get());
    EXPECT_EQ(canvas.At(0, 0), (Colour{9, 9, 9, 255}));
    CGContextSetAlpha(nullptr, 1);
}

TEST(BitmapContextAlpha, LeavesFillsAlone) {
    Canvas canvas(2, 2, kCGImageAlphaPremultipliedLast);
    CGContextSetAlpha(canvas.Get(), 0.5F);
    FillWhite(canvas);
    EXPECT_EQ(canvas.At(0, 0), (Colour{255, 255, 255, 255}));
}

TEST(BitmapContextClip, HoldsImagesFillsAndClearsBackUntilItEnds) {
    const CGImageRef image = Plain(5, 5, CGPixelLayout::RGBX, {9, 9, 9, 255});
    Canvas canvas(10, 10, kCGImageAlphaPremultipliedLast);
    CGContextClipToRect(canvas.Get(), Rect(2, 2, 6, 6));
    CGContextClipToRect(canvas.Get(), Rect(0, 5, 5, 9));
    CGContextDrawImage(canvas.Get(), Rect(0, 0, 10, 10),
                       image.get()); // left 2 to 5, rows 2 to 5 from the top
    for (int y = 0; y < 10; ++y) {
        for (int x = 0; x < 10; ++x)
            ASSERT_EQ(canvas.At(x, y).alpha, x >= 2 && x < 5 && y >= 2 && y < 5 ? 255 : 0) << x << "," << y;
    }
    FillWhite(canvas);
    EXPECT_EQ(canvas.At(1, 1).alpha, 0);
    EXPECT_EQ(canvas.At(2, 2).red, 255);
    CGContextResetClip(canvas.Get());
    FillWhite(canvas);
    EXPECT_EQ(canvas.At(1, 1).alpha, 255);
    CGContextClipToRect(canvas.Get(), Rect(0, 0, 1, 1));
    CGContextClearRect(canvas.Get(), Rect(0, 0, 10, 10));
    EXPECT_EQ(canvas.At(0, 9).alpha, 0);
    EXPECT_EQ(canvas.At(0, 8).alpha, 255);
}

TEST(BitmapContextClip, WithoutAnAreaLetsNothingThrough) {
    Canvas canvas(4, 4, kCGImageAlphaPremultipliedLast);
    for (const CGRect& rect : {Rect(1, 1, 0, 3), Rect(9, 9, 2, 2), Rect(std::nanf(""), 0, 4, 4)}) {
        CGContextResetClip(canvas.Get());
        CGContextClipToRect(canvas.Get(), rect);
        FillWhite(canvas);
        EXPECT_EQ(canvas.memory, Bytes(canvas.memory.size()));
    }
    CGContextClipToRect(nullptr, Rect(0, 0, 1, 1));
    CGContextResetClip(nullptr);
}
