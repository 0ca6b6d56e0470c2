// SPDX-License-Identifier: Apache-2.0
#include "platform/cg_image.h"
#include "platform/window_server.h"
#include "tests/platform/bitmap_tools.h"

#include <gtest/gtest.h>

#include <memory>
#include <utility>

/// Images: what they are made of, what keeps their pixels, what is told of them.

namespace {

using namespace platform;

constexpr Colour RED{255, 0, 0, 255};

void PaintRed(Canvas& canvas, const CGRect& rect) {
    CGContextSetRGBFillColor(canvas.Get(), 1, 0, 0, 1);
    CGContextFillRect(canvas.Get(), rect);
}

} // namespace

TEST(CGImage, OfAContextIsACopy) {
    for (const unsigned info : ALL_INFOS) {
        Canvas canvas(3, 2, info, 8);
        PaintRed(canvas, {{0, 0}, {3, 1}});
        const CGImageRef image = CGBitmapContextCreateImage(canvas.Get());
        PaintRed(canvas, {{0, 0}, {3, 2}});
        ASSERT_NE(image, nullptr);
        EXPECT_EQ(CGImageGetWidth(image.get()), 3);
        EXPECT_EQ(CGImageGetHeight(image.get()), 2);
        EXPECT_NE(PixelOf(*image, 0, 0), RED) << info;
        EXPECT_EQ(PixelOf(*image, 2, 1), RED) << info;
    }
}

TEST(CGImage, KeepsAPicturesPixelsWithoutCopyingThem) {
    auto memory = std::make_shared<Bytes>(64);
    const std::weak_ptr<Bytes> watched = memory;
    auto picture = std::make_shared<Picture>();
    picture->width = 3;
    picture->height = 2;
    picture->stride = 16;
    picture->format = PixelFormat::BGRA;
    picture->pixels = memory->data();
    picture->memory = std::move(memory);
    CGImageRef image = CGImageCreateWithPicture(std::move(picture));
    ASSERT_NE(image, nullptr);
    EXPECT_EQ(image->pixels, watched.lock()->data());
    EXPECT_EQ(image->layout, CGPixelLayout::BGRA);
    EXPECT_EQ(CGImageGetBytesPerRow(image.get()), 16u);
    image.reset();
    EXPECT_TRUE(watched.expired());
}

TEST(CGImage, KnowsEveryFormatOfAPicture) {
    Picture picture;
    Bytes memory(4);
    picture.width = picture.height = 1;
    picture.stride = 4;
    picture.pixels = memory.data();
    const std::pair<PixelFormat, CGPixelLayout> formats[] = {
        {PixelFormat::BGRX, CGPixelLayout::BGRX},
        {PixelFormat::BGRA, CGPixelLayout::BGRA},
        {PixelFormat::RGBX, CGPixelLayout::RGBX},
        {PixelFormat::RGBA, CGPixelLayout::RGBA},
        {PixelFormat::X2R10G10B10, CGPixelLayout::X2R10G10B10}};
    for (const auto& [format, layout] : formats) {
        picture.format = format;
        EXPECT_EQ(CGImageCreateWithPicture(std::make_shared<Picture>(picture))->layout, layout);
    }
    EXPECT_EQ(CGImageCreateWithPicture(nullptr), nullptr);
}

TEST(CGImage, IsRefusedWithoutPixelsOrWithRowsTooShort) {
    const Bytes memory(64);
    EXPECT_NE(CGImageCreate(4, 4, 16, CGPixelLayout::RGBA, memory.data(), nullptr), nullptr);
    EXPECT_EQ(CGImageCreate(4, 4, 15, CGPixelLayout::RGBA, memory.data(), nullptr), nullptr);
    EXPECT_EQ(CGImageCreate(4, 4, 11, CGPixelLayout::RGB, memory.data(), nullptr), nullptr);
    EXPECT_EQ(CGImageCreate(0, 4, 16, CGPixelLayout::RGBA, memory.data(), nullptr), nullptr);
    EXPECT_EQ(CGImageCreate(4, -1, 16, CGPixelLayout::RGBA, memory.data(), nullptr), nullptr);
    EXPECT_EQ(CGImageCreate(4, 4, 16, CGPixelLayout::RGBA, nullptr, nullptr), nullptr);
}

TEST(CGImage, GivesItsBytesWithoutWhatPadsTheRows) {
    const CGImageRef image = MakeImage(
        2, 2, CGPixelLayout::RGBA,
        [](int x, int y) {
            return Colour{x, y, 3, 4};
        },
        5);
    EXPECT_EQ(CGDataProviderCopyData(CGImageGetDataProvider(image)),
              (Bytes{0, 0, 3, 4, 1, 0, 3, 4, 0, 1, 3, 4, 1, 1, 3, 4}));
    EXPECT_EQ(CGDataProviderCopyData(nullptr), Bytes{});
    EXPECT_EQ(CGImageGetWidth(nullptr), 0);
    EXPECT_EQ(CGImageGetHeight(nullptr), 0);
    EXPECT_EQ(CGImageGetBytesPerRow(nullptr), 0u);
}
