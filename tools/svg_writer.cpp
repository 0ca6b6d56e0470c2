// SPDX-License-Identifier: Apache-2.0
#include "tools/svg_writer.h"

#include <array>
#include <cstddef>
#include <cstdio>
#include <utility>

namespace {

/// Without a sign on zero and without a zero behind the point.
std::string Number(double value) {
    std::array<char, 64> buffer{};
    std::snprintf(buffer.data(), buffer.size(), "%.1f", value);
    std::string text = buffer.data();
    if (text.size() > 2 && text.compare(text.size() - 2, 2, ".0") == 0)
        text.resize(text.size() - 2);
    return text == "-0" ? "0" : text;
}

/// As text or as an attribute's value. Titles are anybody's: what XML can't hold at all becomes a space.
std::string Escaped(std::string_view text) {
    constexpr std::string_view NO_CHARACTERS[] = {"\xEF\xBF\xBE", "\xEF\xBF\xBF"}; // U+FFFE, U+FFFF
    std::string escaped;
    for (std::size_t i = 0; i < text.size(); ++i) {
        const std::string_view three = text.substr(i, 3);
        if (three == NO_CHARACTERS[0] || three == NO_CHARACTERS[1]) {
            escaped += ' ';
            i += 2;
            continue;
        }
        const char c = text[i];
        switch (c) {
            case '&':
                escaped += "&amp;";
                break;
            case '<':
                escaped += "&lt;";
                break;
            case '>':
                escaped += "&gt;";
                break;
            case '"':
                escaped += "&quot;";
                break;
            default:
                escaped += static_cast<unsigned char>(c) < 0x20 ? ' ' : c;
        }
    }
    return escaped;
}

std::string Attribute(std::string_view name, std::string_view value) {
    return " " + std::string(name) + "=\"" + Escaped(value) + "\"";
}

std::string Place(const SvgRect& rect) {
    return Attribute("x", Number(rect.x)) + Attribute("y", Number(rect.y)) +
           Attribute("width", Number(rect.width)) + Attribute("height", Number(rect.height));
}

std::string Tile(std::string_view id, std::string_view ground, const std::string& content) {
    return "<pattern" + Attribute("id", id) +
           " width=\"8\" height=\"8\" patternUnits=\"userSpaceOnUse\"><rect width=\"8\" height=\"8\"" +
           Attribute("fill", ground) + "/>" + content + "</pattern>\n";
}

bool IsContinuation(char c) {
    return (static_cast<unsigned char>(c) & 0xC0U) == 0x80U;
}

} // namespace

SvgWriter::SvgWriter(int width, int height) {
    const std::string w = std::to_string(width);
    const std::string h = std::to_string(height);
    m_text = "<svg xmlns=\"http://www.w3.org/2000/svg\"" + Attribute("width", w) + Attribute("height", h) +
             Attribute("viewBox", "0 0 " + w + " " + h) +
             " font-family=\"DejaVu Sans, Verdana, Arial, sans-serif\">\n";
    AddRect({0, 0, static_cast<double>(width), static_cast<double>(height)}, {.fill = "#ffffff"});
}

void SvgWriter::AddHatch(std::string_view id, std::string_view ground, std::string_view line) {
    m_text += Tile(id, ground,
                   "<path d=\"M-2,2 L2,-2 M0,8 L8,0 M6,10 L10,6\" stroke-width=\"1.6\"" +
                       Attribute("stroke", line) + "/>");
}

void SvgWriter::AddDots(std::string_view id, std::string_view ground, std::string_view dot) {
    m_text += Tile(id, ground, "<circle cx=\"4\" cy=\"4\" r=\"1\"" + Attribute("fill", dot) + "/>");
}

void SvgWriter::AddRect(const SvgRect& rect, const SvgShape& shape) {
    m_text += "<rect" + Place(rect) + Attribute("fill", shape.fill);
    if (shape.fillOpacity < 1)
        m_text += Attribute("fill-opacity", Number(shape.fillOpacity));
    if (shape.stroke != "none")
        m_text += Attribute("stroke", shape.stroke) + Attribute("stroke-width", Number(shape.strokeWidth));
    if (shape.isDashed)
        m_text += Attribute("stroke-dasharray", "5 3");
    m_text += "/>\n";
}

void SvgWriter::AddText(double x, double y, std::string_view text, const SvgLettering& lettering) {
    m_text += "<text" + Attribute("x", Number(x)) + Attribute("y", Number(y)) +
              Attribute("font-size", Number(lettering.size)) + Attribute("fill", lettering.fill);
    if (lettering.isBold)
        m_text += Attribute("font-weight", "bold");
    if (lettering.hasHalo)
        m_text += " stroke=\"#ffffff\" stroke-width=\"3\" stroke-linejoin=\"round\" paint-order=\"stroke\"";
    m_text += ">" + Escaped(text) + "</text>\n";
}

void SvgWriter::OpenFrame(std::string_view id, const SvgRect& rect) {
    m_text += "<clipPath" + Attribute("id", id) + "><rect" + Place({0, 0, rect.width, rect.height}) +
              "/></clipPath>\n<g" +
              Attribute("transform", "translate(" + Number(rect.x) + " " + Number(rect.y) + ")") + "><g" +
              Attribute("clip-path", "url(#" + std::string(id) + ")") + ">\n";
}

void SvgWriter::CloseFrame() {
    m_text += "</g></g>\n";
}

std::string SvgWriter::Finish() {
    m_text += "</svg>\n";
    return std::move(m_text);
}

std::string ShortenText(std::string_view text, int most) {
    int characters = 0;
    std::size_t endOfKept = 0; // before the last character that may stay when there are too many
    for (std::size_t i = 0; i < text.size(); ++i) {
        if (IsContinuation(text[i]))
            continue;
        if (characters == most - 1)
            endOfKept = i;
        if (++characters > most)
            return most > 0 ? std::string(text.substr(0, endOfKept)) + "\u2026" : std::string();
    }
    return std::string(text);
}
