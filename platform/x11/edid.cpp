// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/display_mirror.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>

namespace platform::x11 {

namespace {

constexpr std::size_t BLOCK_SIZE = 128;
constexpr std::array<std::uint8_t, 8> HEADER = {0, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0};

constexpr std::size_t FIRST_DESCRIPTOR = 54;
constexpr std::size_t DESCRIPTOR_COUNT = 4;
constexpr std::size_t DESCRIPTOR_SIZE = 18;
constexpr std::size_t TEXT_START = 5; // in a descriptor

constexpr std::uint8_t PRODUCT_NAME = 0xFC;
constexpr std::uint8_t FREE_TEXT = 0xFE;

using Descriptor = std::span<const std::uint8_t>;

bool HasTag(Descriptor descriptor, std::uint8_t tag) {
    return descriptor[0] == 0 && descriptor[1] == 0 && descriptor[2] == 0 && descriptor[3] == tag;
}

/// Makers pad with blanks, or end the text with a line feed and leave anything behind it.
std::string TrimmedTextOf(Descriptor descriptor) {
    std::string text;
    for (const std::uint8_t byte : descriptor.subspan(TEXT_START)) {
        if (byte == '\n' || byte == 0)
            break;
        if (byte >= ' ' && byte < 0x7F)
            text.push_back(static_cast<char>(byte));
    }
    const std::size_t first = text.find_first_not_of(' ');
    if (first == std::string::npos)
        return {};
    return text.substr(first, text.find_last_not_of(' ') - first + 1);
}

std::string TextWithTag(std::span<const std::uint8_t> edid, std::uint8_t tag) {
    for (std::size_t i = 0; i < DESCRIPTOR_COUNT; ++i) {
        const Descriptor descriptor = edid.subspan(FIRST_DESCRIPTOR + i * DESCRIPTOR_SIZE, DESCRIPTOR_SIZE);
        if (!HasTag(descriptor, tag))
            continue;
        if (std::string text = TrimmedTextOf(descriptor); !text.empty())
            return text;
    }
    return {};
}

} // namespace

/// The checksum is not looked at: monitors with a wrong one are sold, and nothing but a name hangs on it.
std::string ProductNameFromEdid(std::span<const std::uint8_t> edid) {
    if (edid.size() < BLOCK_SIZE || !std::equal(HEADER.begin(), HEADER.end(), edid.begin()))
        return {};
    std::string name = TextWithTag(edid, PRODUCT_NAME);
    return !name.empty() ? name : TextWithTag(edid, FREE_TEXT);
}

} // namespace platform::x11
