// SPDX-License-Identifier: Apache-2.0
// Images of any size, drawn into any place: a few rows at a time, and at once.
#include "platform/bitmap_context_clip.h"
#include "platform/picture_changes.h"
#include "platform/window_image_drawing.h"
#include "platform/window_image_layers.h"
#include "tests/platform/bitmap_tools.h"
#include "tests/support/test_effort.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <random>
#include <string>
#include <utility>

using namespace platform;

namespace {

constexpr int ROWS_WIDTH = 150;
constexpr int ROWS_HEIGHT = 110;

class RowsDice {
public:
    explicit RowsDice(unsigned seed) : m_random(seed) {}

    int Between(int least, int most) {
        return least + static_cast<int>(m_random() % static_cast<unsigned>(most - least + 1));
    }
    bool OneIn(int count) { return Between(1, count) == 1; }
    std::uint8_t Byte() { return static_cast<std::uint8_t>(Between(0, 255)); }

private:
    std::mt19937 m_random;
};

/// Where images go that are as they are, or smaller by all that there are other ways for, or larger.
CGRect AnyPlaceFor(int width, int height, RowsDice& dice, std::string& kind) {
    const auto scaled = [&dice](int length, int numerator, int denominator) {
        return static_cast<float>(std::max(1, length * numerator / denominator + dice.Between(0, 1)));
    };
    CGRect place{{static_cast<float>(dice.Between(0, 20)), static_cast<float>(dice.Between(0, 20))}, {}};
    switch (dice.Between(0, 5)) {
        case 0:
            kind = "half";
            place.size = {static_cast<float>((width + 1) / 2), static_cast<float>((height + 1) / 2)};
            break;
        case 1:
            kind = "quarter";
            place.size = {static_cast<float>(std::max(width / 4, 1)),
                          static_cast<float>(std::max(height / 4, 1))};
            break;
        case 2:
            kind = "up to half";
            place.size = {static_cast<float>(dice.Between((width + 1) / 2, width)),
                          static_cast<float>(dice.Between((height + 1) / 2, height))};
            break;
        case 3:
            kind = "third";
            place.size = {scaled(width, 1, 3), scaled(height, 1, 3)};
            break;
        case 4:
            kind = "larger";
            place.size = {scaled(width, 3, 2), scaled(height, 5, 3)};
            break;
        default:
            kind = "any";
            place.size = {static_cast<float>(dice.Between(1, 2 * ROWS_WIDTH)),
                          static_cast<float>(dice.Between(1, 2 * ROWS_HEIGHT))};
    }
    if (dice.OneIn(3)) {
        place.origin = {static_cast<float>(dice.Between(-100, ROWS_WIDTH)),
                        static_cast<float>(dice.Between(-100, ROWS_HEIGHT))};
        kind += ", anywhere";
    }
    return place;
}

struct RowsSize {
    int width;
    int height;
};

RowsSize AnySizeOfRows(RowsDice& dice) {
    const int longest = dice.OneIn(4) ? 8 : 200;
    RowsSize size{dice.Between(1, longest), dice.Between(1, longest)};
    if (dice.OneIn(2)) { // to a quarter
        size.width = std::max(size.width / 4 * 4, 4);
        size.height = std::max(size.height / 4 * 4, 4);
    }
    return size;
}

void PrepareRows(const Canvas& canvas, bool isHigh, float alpha) {
    CGContextSetInterpolationQuality(canvas.Get(), isHigh ? kCGInterpolationHigh : kCGInterpolationDefault);
    CGContextSetAlpha(canvas.Get(), alpha);
}

} // namespace

TEST(CGContextRows, ComeOutAsInTheWholeHoweverFewAreDrawn) {
    std::map<std::string, int> counts;
    const int rounds = TestRounds(2000);
    for (int round = 0; round < rounds; ++round) {
        RowsDice dice(static_cast<unsigned>(round));
        const CGPixelLayout layout = ALL_LAYOUTS[static_cast<std::size_t>(dice.Between(0, 6))];
        const auto [width, height] = AnySizeOfRows(dice);
        const CGImageRef image = MakeImage(
            width, height, layout,
            [&](int, int) {
                return Colour{dice.Byte(), dice.Byte(), dice.Byte(), dice.Byte()};
            },
            static_cast<std::size_t>(dice.Between(0, 5)));
        std::string kind;
        const CGRect place = AnyPlaceFor(width, height, dice, kind);
        const unsigned info = ALL_INFOS[static_cast<std::size_t>(dice.Between(0, 3))];
        Canvas whole(ROWS_WIDTH, ROWS_HEIGHT, info);
        Canvas rows(ROWS_WIDTH, ROWS_HEIGHT, info);
        std::generate(whole.memory.begin(), whole.memory.end(), [&] { return dice.Byte(); });
        rows.memory = whole.memory;
        const bool isHigh = dice.OneIn(2);
        const float alpha = dice.OneIn(4) ? 0.6F : 1;
        for (const Canvas* const canvas : {&whole, &rows})
            PrepareRows(*canvas, isHigh, alpha);
        ASSERT_TRUE(CGContextDrawImage(whole.Get(), place, image.get()));
        for (int top = 0; top < ROWS_HEIGHT;) {
            const int end = std::min(top + (dice.OneIn(3) ? 1 : dice.Between(1, 50)), ROWS_HEIGHT);
            CGContextSetClip(rows.Get(), {0, top, ROWS_WIDTH, end});
            ASSERT_TRUE(CGContextDrawImage(rows.Get(), place, image.get()));
            top = end;
        }
        ASSERT_EQ(whole.memory, rows.memory)
            << "round " << round << ": " << width << "x" << height << " of layout "
            << static_cast<int>(layout) << " " << kind << " into " << place.origin.x << "," << place.origin.y
            << " " << place.size.width << "x" << place.size.height;
        ++counts[kind];
    }
    EXPECT_EQ(counts.size(), 12U);
}

// ---- What a change of a picture changes of its drawing

namespace {

/// An image of one window, whose picture may be changed.
class WindowOfRows {
public:
    WindowOfRows(RowsSize size, CGPixelLayout layout, RowsDice& dice)
        : m_dice(dice),
          m_size(size),
          m_layout(layout),
          m_bytes(static_cast<std::size_t>(size.width * size.height) * 4) {
        std::generate(m_bytes.begin(), m_bytes.end(), [&] { return dice.Byte(); });
        m_picture.width = size.width;
        m_picture.height = size.height;
        m_picture.serial = NextPictureSerial();
    }

    /// Turns all of a rectangle over.
    void Paint(const PixelRect& rect) {
        for (int y = rect.top; y < rect.bottom; ++y) {
            for (int at = (y * m_size.width + rect.left) * 4; at < (y * m_size.width + rect.right) * 4; ++at)
                m_bytes[static_cast<std::size_t>(at)] ^= 0xFFU;
        }
        Picture next = m_picture;
        next.serial = NextPictureSerial();
        next.steps = StepsAfter(m_picture, PixelRegion(rect));
        m_picture = std::move(next);
    }
    PixelRect AnyRect() {
        const int left = m_dice.Between(0, m_size.width - 1);
        const int top = m_dice.Between(0, m_size.height - 1);
        return {left, top, m_dice.Between(left + 1, m_size.width), m_dice.Between(top + 1, m_size.height)};
    }
    CGWindowImage Image() const {
        const CGRect rect{{0, 0}, {static_cast<float>(m_size.width), static_cast<float>(m_size.height)}};
        const auto bytes = std::make_shared<Bytes>(m_bytes);
        const auto stride = static_cast<std::size_t>(m_size.width) * 4;
        const CGImageRef image =
            CGImageCreate(m_size.width, m_size.height, stride, m_layout, bytes->data(), bytes);
        return {PointEdges(rect), m_size.width,
                m_size.height,    {{1, std::make_shared<Picture>(m_picture), image, PointEdges(rect), 1.0F}},
                std::nullopt,     0};
    }

private:
    RowsDice& m_dice;
    const RowsSize m_size;
    const CGPixelLayout m_layout;
    Bytes m_bytes;
    Picture m_picture;
};

/// A canvas that windows are drawn on, over black.
class CanvasOfRows {
public:
    CanvasOfRows(const CGRect& place, bool isHigh) : m_place(place) { PrepareRows(m_canvas, isHigh, 1); }

    WindowImageDrawing DrawWhole(const CGWindowImage& image) {
        DrawIn({0, 0, ROWS_WIDTH, ROWS_HEIGHT}, image);
        WindowImageDrawing drawing;
        EXPECT_TRUE(drawing.Describe(m_canvas.Get(), m_place, &image));
        return drawing;
    }
    /// Only what is another than before. Tells how many rows.
    int DrawChanges(const WindowImageDrawing& before, const CGWindowImage& image) {
        WindowImageDrawing now;
        PixelRegion changes;
        EXPECT_TRUE(now.Describe(m_canvas.Get(), m_place, &image));
        EXPECT_TRUE(now.AddChanges(before, &image, changes));
        const std::optional<PixelRegion> part = now.PartFor(changes);
        if (!part) {
            ADD_FAILURE() << "no part";
            return 0;
        }
        int rows = 0;
        for (const PixelRect& rect : part->Rects()) {
            DrawIn({rect.left, rect.top, rect.right, rect.bottom}, image);
            rows += rect.bottom - rect.top;
        }
        return rows;
    }
    const Bytes& Memory() const { return m_canvas.memory; }

private:
    void DrawIn(const PixelBox& clip, const CGWindowImage& image) {
        CGContextSetClip(m_canvas.Get(), clip);
        CGContextFillRect(m_canvas.Get(), {{0, 0}, {ROWS_WIDTH, ROWS_HEIGHT}});
        EXPECT_TRUE(CGContextDrawWindowImage(m_canvas.Get(), m_place, &image));
    }

    const CGRect m_place;
    Canvas m_canvas{ROWS_WIDTH, ROWS_HEIGHT, kCGImageAlphaNoneSkipLast};
};

} // namespace

TEST(CGContextRows, AreAllThatAPaintingOfAScaledWindowChanges) {
    constexpr CGPixelLayout FOUR_BYTES[] = {CGPixelLayout::BGRX, CGPixelLayout::RGBX, CGPixelLayout::BGRA};
    const int rounds = TestRounds(2000);
    int drawn = 0;
    for (int round = 0; round < rounds && !testing::Test::HasFailure(); ++round) {
        RowsDice dice(static_cast<unsigned>(round) + 100000);
        const RowsSize size = AnySizeOfRows(dice);
        WindowOfRows window(size, FOUR_BYTES[dice.Between(0, 2)], dice);
        std::string kind;
        CanvasOfRows canvas(AnyPlaceFor(size.width, size.height, dice, kind), dice.OneIn(2));
        const WindowImageDrawing before = canvas.DrawWhole(window.Image());
        window.Paint(window.AnyRect());
        drawn += canvas.DrawChanges(before, window.Image());
        const Bytes inParts = canvas.Memory();
        canvas.DrawWhole(window.Image());
        EXPECT_TRUE(inParts == canvas.Memory()) << "round " << round << ", " << kind;
    }
    EXPECT_LT(drawn, rounds * ROWS_HEIGHT / 3);
}
