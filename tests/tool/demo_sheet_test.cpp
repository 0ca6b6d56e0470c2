// SPDX-License-Identifier: Apache-2.0
#include "tools/demo_sheet.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <memory>
#include <ostream>
#include <string>
#include <vector>

namespace {

using Lines = std::vector<std::string>;

constexpr TVLSize WIDE_SCREEN{2080, 800};
constexpr TVLSize SCREEN{1280, 800};
constexpr TVLSize NOTHING{0, 0};

bool AreApart(const SheetPlace& one, const SheetPlace& other) {
    return one.x + one.width <= other.x || other.x + other.width <= one.x || one.y + one.height <= other.y ||
           other.y + other.height <= one.y;
}

bool LiesWithin(const SheetPlace& place, const SheetLayout& layout) {
    return place.x >= 0 && place.y >= 0 && place.x + place.width <= layout.width &&
           place.y + place.height <= layout.height;
}

/// Everything has a place of its own on the sheet, captions, which have 52 rows above pictures, too.
void ExpectOrder(const SheetLayout& layout) {
    std::vector<SheetPlace> places{layout.text};
    for (const SheetPlace& picture : layout.pictures)
        places.push_back({picture.x, picture.y - 52, picture.width, picture.height + 52});
    for (std::size_t i = 0; i < places.size(); ++i) {
        EXPECT_TRUE(LiesWithin(places[i], layout)) << "place " << i;
        for (std::size_t k = 0; k < i; ++k)
            EXPECT_TRUE(AreApart(places[i], places[k])) << "places " << k << " and " << i;
    }
}

platform::CGImageRef Filled(int width, int height, std::uint8_t grey) {
    const auto pixels = std::make_shared<std::vector<std::uint8_t>>(
        static_cast<std::size_t>(width) * static_cast<std::size_t>(height) * 4, grey);
    return platform::CGImageCreate(width, height, static_cast<std::size_t>(width) * 4,
                                   platform::CGPixelLayout::RGBX, pixels->data(), pixels);
}

/// The red of a pixel of a sheet, whose pixels begin with it.
int RedAt(const platform::CGImage& sheet, int x, int y) {
    return sheet.pixels[static_cast<std::size_t>(y) * sheet.bytesPerRow + static_cast<std::size_t>(x) * 4];
}

bool HasDarkPixels(const platform::CGImage& sheet, const SheetPlace& place) {
    for (int y = place.y; y < place.y + place.height; ++y) {
        for (int x = place.x; x < place.x + place.width; ++x) {
            if (RedAt(sheet, x, y) < 0x60)
                return true;
        }
    }
    return false;
}

} // namespace

TEST(DemoSheet, GivesPicturesOfOneShapeOneHeight) {
    const SheetLayout layout = LayOutSheet({WIDE_SCREEN, SCREEN, SCREEN, SCREEN, SCREEN});
    ASSERT_EQ(layout.pictures.size(), 5u);
    EXPECT_EQ(layout.pictures[0], (SheetPlace{20, 72, 676, 260}));
    EXPECT_EQ(layout.pictures[1], (SheetPlace{716, 72, 416, 260}));
    EXPECT_EQ(layout.pictures[2], (SheetPlace{1152, 72, 416, 260}));
    EXPECT_EQ(layout.pictures[3], (SheetPlace{716, 404, 416, 260}));
    EXPECT_EQ(layout.pictures[4], (SheetPlace{1152, 404, 416, 260}));
    EXPECT_EQ(layout.width, 1588);
    EXPECT_EQ(layout.height, 684);
    ExpectOrder(layout);
}

TEST(DemoSheet, FindsRoomForPicturesOfAnyShape) {
    const std::vector<std::vector<TVLSize>> shapes{{SCREEN, NOTHING, SCREEN, NOTHING, SCREEN},
                                                   {{30, 4000}, {4000, 30}, {1, 1}, {1, 30000}, {30000, 1}},
                                                   {NOTHING, NOTHING, NOTHING, NOTHING, NOTHING},
                                                   {SCREEN},
                                                   {SCREEN, {3, 5}, NOTHING}};
    for (const std::vector<TVLSize>& sizes : shapes) {
        const SheetLayout layout = LayOutSheet(sizes);
        ASSERT_EQ(layout.pictures.size(), sizes.size());
        for (const SheetPlace& picture : layout.pictures) {
            EXPECT_GE(picture.width, 1);
            EXPECT_GE(picture.height, 1);
        }
        ExpectOrder(layout);
    }
}

TEST(DemoSheet, NeverMakesAPictureLarger) {
    const SheetLayout layout = LayOutSheet({{50, 40}, SCREEN});
    EXPECT_EQ(layout.pictures[0].width, 50);
    EXPECT_EQ(layout.pictures[0].height, 40);
}

TEST(DemoSheet, BreaksLinesBetweenWords) {
    EXPECT_EQ(BrokenIntoLines("one two three", 7), (Lines{"one two", "three"}));
    EXPECT_EQ(BrokenIntoLines("one two three", 13), (Lines{"one two three"}));
    EXPECT_EQ(BrokenIntoLines("incomprehensible", 6), (Lines{"incomp", "rehens", "ible"}));
    EXPECT_EQ(BrokenIntoLines("", 6), (Lines{""}));
    EXPECT_EQ(BrokenIntoLines("ab", 0), (Lines{"a", "b"})) << "goes on, whatever the width";
}

TEST(DemoSheet, DrawsPicturesCaptionsAndText) {
    const platform::CGImageRef black = Filled(1280, 800, 0);
    const platform::CGImageRef sheet =
        DrawSheet({{"1", "", black}, {"", "two", black}, {"", "no picture", nullptr}}, {"Words"});
    ASSERT_NE(sheet, nullptr);
    const SheetLayout layout = LayOutSheet({SCREEN, SCREEN, NOTHING});
    ASSERT_EQ(sheet->width, layout.width);
    ASSERT_EQ(sheet->height, layout.height);
    const SheetPlace& first = layout.pictures[0];
    const SheetPlace& empty = layout.pictures[2];
    EXPECT_EQ(RedAt(*sheet, first.x, first.y), 0);
    EXPECT_EQ(RedAt(*sheet, first.x + first.width - 1, first.y + first.height - 1), 0);
    EXPECT_GT(RedAt(*sheet, first.x + first.width + 5, first.y), 0xE0) << "paper beside it";
    EXPECT_FALSE(HasDarkPixels(*sheet, empty)) << "an empty frame";
    EXPECT_TRUE(HasDarkPixels(*sheet, {first.x, first.y - 52, 20, 20}));
    EXPECT_TRUE(HasDarkPixels(*sheet, {empty.x, empty.y - 28, 100, 20}));
    EXPECT_TRUE(HasDarkPixels(*sheet, {layout.text.x, layout.text.y, 50, 20}));
    EXPECT_FALSE(HasDarkPixels(*sheet, {layout.text.x + 60, layout.text.y, 100, 20}))
        << "behind the last word";
}
