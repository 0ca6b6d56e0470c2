// SPDX-License-Identifier: Apache-2.0
#include "tools/demo_sheet.h"

#include "platform/bitmap_context.h"
#include "platform/bitmap_font.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <string_view>

namespace {

constexpr int SHEET_MARGIN = 20;
constexpr int PICTURE_HEIGHT = 260;
constexpr int WIDEST_PICTURE = 700;
constexpr int EMPTY_WIDTH = 400;
constexpr int NARROWEST_COLUMN = 320;
constexpr int NARROWEST_TEXT = 420;
constexpr int SHEET_LINE = 24;
constexpr int CAPTION_HEIGHT = 2 * SHEET_LINE + 4;
constexpr int ROW_HEIGHT = CAPTION_HEIGHT + PICTURE_HEIGHT + SHEET_MARGIN;

constexpr std::uint32_t PAPER_RGB = 0xF4F5F7;
constexpr std::uint32_t INK_RGB = 0x1D2530;
constexpr std::uint32_t PALE_INK_RGB = 0x5B6572;
constexpr std::uint32_t EDGE_RGB = 0x8A93A0;
constexpr std::uint32_t EMPTY_RGB = 0xDFE2E7;

TVLSize FittedSize(TVLSize size) {
    if (size.cx < 1 || size.cy < 1)
        return {EMPTY_WIDTH, PICTURE_HEIGHT};
    const double scale = std::min(
        {1.0, static_cast<double>(PICTURE_HEIGHT) / size.cy, static_cast<double>(WIDEST_PICTURE) / size.cx});
    return {std::max(1, static_cast<int>(size.cx * scale)), std::max(1, static_cast<int>(size.cy * scale))};
}

/// The first picture has a column of its own; the others go row by row into as many columns as two rows need.
int ColumnOf(std::size_t picture, std::size_t count) {
    const std::size_t others = count / 2;
    return picture == 0 ? 0 : 1 + static_cast<int>((picture - 1) % std::max<std::size_t>(others, 1));
}

int RowOf(std::size_t picture, std::size_t count) {
    const std::size_t others = count / 2;
    return picture == 0 ? 0 : static_cast<int>((picture - 1) / std::max<std::size_t>(others, 1));
}

std::string InAscii(std::string_view text) {
    std::string plain;
    for (const char c : text) {
        const auto byte = static_cast<unsigned char>(c);
        // A character of several bytes is one that the font doesn't have.
        if ((byte & 0xC0U) != 0x80U)
            plain += byte < 0x80 ? c : '?';
    }
    return plain;
}

/// What a sheet is painted on, counted from the top.
class SheetCanvas {
public:
    SheetCanvas(int width, int height)
        : m_width(width),
          m_height(height),
          m_pixels(static_cast<std::size_t>(width) * static_cast<std::size_t>(height) * 4),
          m_context(platform::CGBitmapContextCreate(m_pixels.data(), m_pixels.size(), width, height, 8,
                                                    width * 4, platform::kCGImageAlphaNoneSkipLast)) {
        platform::CGContextSetInterpolationQuality(m_context.get(), platform::kCGInterpolationHigh);
    }

    void Fill(const SheetPlace& place, std::uint32_t rgb) {
        const auto part = [rgb](int shift) { return static_cast<float>(rgb >> shift & 0xFFU) / 255.0F; };
        platform::CGContextSetRGBFillColor(m_context.get(), part(16), part(8), part(0), 1);
        platform::CGContextFillRect(m_context.get(), RectOf(place));
    }

    void Draw(const SheetPlace& place, const platform::CGImage& image) {
        platform::CGContextDrawImage(m_context.get(), RectOf(place), &image);
    }

    /// Cut at `columns` characters.
    void Write(int left, int top, const std::string& words, int columns, std::uint32_t rgb) {
        const std::string text = InAscii(words).substr(0, static_cast<std::size_t>(std::max(columns, 0)));
        const int length = static_cast<int>(text.size()) * platform::BITMAP_FONT_WIDTH;
        for (int y = 0; y < platform::BITMAP_FONT_HEIGHT; ++y) {
            for (int x = 0; x < length; ++x) {
                if (platform::HasInk(text, x, y))
                    SetPixel(left + x, top + y, rgb);
            }
        }
    }

    platform::CGImageRef Image() const { return platform::CGBitmapContextCreateImage(m_context.get()); }

private:
    platform::CGRect RectOf(const SheetPlace& place) const {
        return {{static_cast<float>(place.x), static_cast<float>(m_height - place.y - place.height)},
                {static_cast<float>(place.width), static_cast<float>(place.height)}};
    }

    void SetPixel(int x, int y, std::uint32_t rgb) {
        if (x < 0 || y < 0 || x >= m_width || y >= m_height)
            return;
        std::uint8_t* const pixel =
            m_pixels.data() +
            (static_cast<std::size_t>(y) * static_cast<std::size_t>(m_width) + static_cast<std::size_t>(x)) *
                4;
        for (int i = 0; i < 3; ++i)
            pixel[i] = static_cast<std::uint8_t>(rgb >> (16 - 8 * i));
    }

    const int m_width;
    const int m_height;
    std::vector<std::uint8_t> m_pixels;
    platform::CGContextRef m_context;
};

int ColumnsIn(int width) {
    return width / platform::BITMAP_FONT_WIDTH;
}

void DrawPicture(SheetCanvas& canvas, const SheetPicture& picture, const SheetPlace& place) {
    const int columns = ColumnsIn(std::max(place.width, NARROWEST_COLUMN));
    const int top = place.y - CAPTION_HEIGHT;
    canvas.Write(place.x, top, picture.title, columns, INK_RGB);
    canvas.Write(place.x, top + SHEET_LINE, picture.caption, columns, PALE_INK_RGB);
    canvas.Fill({place.x - 1, place.y - 1, place.width + 2, place.height + 2}, EDGE_RGB);
    if (picture.image != nullptr)
        canvas.Draw(place, *picture.image);
    else
        canvas.Fill(place, EMPTY_RGB);
}

void WriteParagraphs(SheetCanvas& canvas, const std::vector<std::string>& paragraphs,
                     const SheetPlace& place) {
    int top = place.y;
    for (const std::string& paragraph : paragraphs) {
        for (const std::string& line : BrokenIntoLines(InAscii(paragraph), ColumnsIn(place.width))) {
            if (top + platform::BITMAP_FONT_HEIGHT > place.y + place.height)
                return;
            canvas.Write(place.x, top, line, ColumnsIn(place.width), INK_RGB);
            top += SHEET_LINE;
        }
        top += SHEET_LINE / 2;
    }
}

} // namespace

SheetLayout LayOutSheet(const std::vector<TVLSize>& sizes) {
    std::vector<int> widths{NARROWEST_TEXT};
    for (std::size_t i = 0; i < sizes.size(); ++i) {
        const auto column = static_cast<std::size_t>(ColumnOf(i, sizes.size()));
        widths.resize(std::max(widths.size(), column + 1), NARROWEST_COLUMN);
        widths[column] = std::max(widths[column], FittedSize(sizes[i]).cx);
    }
    SheetLayout layout;
    std::vector<int> lefts;
    layout.width = SHEET_MARGIN;
    for (const int width : widths) {
        lefts.push_back(layout.width);
        layout.width += width + SHEET_MARGIN;
    }
    layout.height = SHEET_MARGIN + 2 * ROW_HEIGHT;
    for (std::size_t i = 0; i < sizes.size(); ++i) {
        const TVLSize size = FittedSize(sizes[i]);
        layout.pictures.push_back({lefts[static_cast<std::size_t>(ColumnOf(i, sizes.size()))],
                                   SHEET_MARGIN + RowOf(i, sizes.size()) * ROW_HEIGHT + CAPTION_HEIGHT,
                                   size.cx, size.cy});
    }
    layout.text = {SHEET_MARGIN, SHEET_MARGIN + ROW_HEIGHT, widths.front(), ROW_HEIGHT - SHEET_MARGIN};
    return layout;
}

platform::CGImageRef DrawSheet(const std::vector<SheetPicture>& pictures,
                               const std::vector<std::string>& paragraphs) {
    std::vector<TVLSize> sizes;
    sizes.reserve(pictures.size());
    for (const SheetPicture& picture : pictures)
        sizes.push_back({platform::CGImageGetWidth(picture.image.get()),
                         platform::CGImageGetHeight(picture.image.get())});
    const SheetLayout layout = LayOutSheet(sizes);
    SheetCanvas canvas(layout.width, layout.height);
    canvas.Fill({0, 0, layout.width, layout.height}, PAPER_RGB);
    for (std::size_t i = 0; i < pictures.size(); ++i)
        DrawPicture(canvas, pictures[i], layout.pictures[i]);
    WriteParagraphs(canvas, paragraphs, layout.text);
    return canvas.Image();
}

std::vector<std::string> BrokenIntoLines(const std::string& paragraph, int columns) {
    const auto most = static_cast<std::size_t>(std::max(columns, 1));
    std::vector<std::string> lines;
    std::string rest = paragraph;
    while (rest.size() > most) {
        const std::size_t blank = rest.rfind(' ', most);
        const bool hasBreak = blank != std::string::npos && blank > 0;
        lines.push_back(rest.substr(0, hasBreak ? blank : most));
        rest.erase(0, hasBreak ? blank + 1 : most);
    }
    lines.push_back(rest);
    return lines;
}
