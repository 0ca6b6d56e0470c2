// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>

/// Writes an SVG picture element by element, in the order in which they are to cover each other.
/// Units: user units, which viewers show as pixels; y grows downwards. Numbers keep one digit behind the
/// point, so the same picture gives the same text on every machine.
/// Threads: one at a time. Errors: nothing throws but for want of memory.

struct SvgRect {
    double x = 0;
    double y = 0;
    double width = 0;
    double height = 0;
};

/// Paints are SVG paints: "none", "#rrggbb", "url(#pattern)".
struct SvgShape {
    std::string_view fill = "none";
    double fillOpacity = 1;
    std::string_view stroke = "none";
    double strokeWidth = 1;
    bool isDashed = false;
};

struct SvgLettering {
    double size = 12;
    std::string_view fill = "#222222";
    bool isBold = false;
    /// A white edge around the letters, for text that lies over shapes.
    bool hasHalo = false;
};

class SvgWriter {
public:
    SvgWriter(int width, int height);

    /// Diagonal lines on a ground, as the paint "url(#id)".
    void AddHatch(std::string_view id, std::string_view ground, std::string_view line);
    /// Dots on a ground, as the paint "url(#id)".
    void AddDots(std::string_view id, std::string_view ground, std::string_view dot);

    void AddRect(const SvgRect& rect, const SvgShape& shape);
    /// `text` is UTF-8; (x, y) is the left end of its base line.
    void AddText(double x, double y, std::string_view text, const SvgLettering& lettering);

    /// What comes until CloseFrame is cut at the edges of `rect`, in whose top left corner the origin then
    /// is.
    void OpenFrame(std::string_view id, const SvgRect& rect);
    void CloseFrame();

    /// The whole picture; nothing can be added afterwards.
    std::string Finish();

private:
    std::string m_text;
};

/// Up to `most` characters of `text`, the last one an ellipsis where something had to go.
std::string ShortenText(std::string_view text, int most);
