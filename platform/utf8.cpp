// SPDX-License-Identifier: Apache-2.0
#include "platform/utf8.h"

#include <algorithm>
#include <cstddef>

namespace platform {

namespace {

/// How many bytes the character at the beginning takes; 0 when there is none that UTF-8 allows.
std::size_t LengthOfCharacter(std::string_view text) {
    const auto byte = [text](std::size_t place) { return static_cast<unsigned char>(text[place]); };
    const unsigned first = byte(0);
    if (first < 0x80)
        return 1;
    const std::size_t length = first >= 0xF0 ? 4 : first >= 0xE0 ? 3 : 2;
    if (first < 0xC2 || first > 0xF4 || text.size() < length)
        return 0;
    for (std::size_t place = 1; place < length; ++place) {
        if ((byte(place) & 0xC0) != 0x80)
            return 0;
    }
    // Overlong forms, surrogates, and what lies beyond the last character.
    const unsigned second = byte(1);
    const bool wrong = (first == 0xE0 && second < 0xA0) || (first == 0xED && second > 0x9F) ||
                       (first == 0xF0 && second < 0x90) || (first == 0xF4 && second > 0x8F);
    return wrong ? 0 : length;
}

/// The bytes that the control character at the beginning takes; 0 when there is another one.
std::size_t LengthOfControl(std::string_view text) {
    const auto first = static_cast<unsigned char>(text[0]);
    if (first < 0x20 || first == 0x7F)
        return 1;
    // U+0080 to U+009F.
    const bool isHigh = first == 0xC2 && text.size() > 1 && static_cast<unsigned char>(text[1]) < 0xA0;
    return isHigh ? 2 : 0;
}

} // namespace

std::string MendedUtf8(std::string_view text) {
    std::string mended;
    mended.reserve(text.size());
    while (!text.empty()) {
        const std::size_t length = LengthOfCharacter(text);
        mended += length != 0 ? text.substr(0, length) : "\xEF\xBF\xBD";
        text.remove_prefix(std::max<std::size_t>(length, 1));
    }
    return mended;
}

std::string Utf8FromLatin1(std::string_view text) {
    std::string utf8;
    for (const char each : text) {
        const auto byte = static_cast<unsigned char>(each);
        if (byte < 0x80) {
            utf8 += each;
            continue;
        }
        utf8 += static_cast<char>(0xC0 | (byte >> 6));
        utf8 += static_cast<char>(0x80 | (byte & 0x3F));
    }
    return utf8;
}

std::string WithoutControls(std::string_view utf8) {
    std::string plain;
    bool afterControl = false;
    while (!utf8.empty()) {
        const std::size_t control = LengthOfControl(utf8);
        if (control == 0) {
            if (afterControl && !plain.empty())
                plain += ' ';
            plain += utf8[0];
        }
        afterControl = control != 0;
        utf8.remove_prefix(std::max<std::size_t>(control, 1));
    }
    return plain;
}

} // namespace platform
