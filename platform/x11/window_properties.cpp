// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/window_properties.h"

#include "platform/utf8.h"
#include "platform/x11/reply_bytes.h"

#include <xcb/res.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstddef>
#include <cstring>
#include <string_view>

namespace platform::x11 {

namespace {

/// Higher ones are given out by no kernel.
constexpr std::uint32_t HIGHEST_PID = 1U << 22U;

std::uint32_t WordAt(std::span<const std::uint8_t> bytes, std::size_t place) {
    std::uint32_t word = 0;
    std::memcpy(&word, bytes.data() + place * sizeof word, sizeof word);
    return word;
}

std::string_view TextOf(const Property& property) {
    if (property.format != 8)
        return {};
    return {reinterpret_cast<const char*>(property.bytes.data()), property.bytes.size()};
}

std::string Readable(const Property& property, xcb_atom_t utf8String) {
    const std::string_view text = TextOf(property);
    return WithoutControls(property.type == utf8String ? MendedUtf8(text) : Utf8FromLatin1(text));
}

std::optional<pid_t> PidFrom(std::uint32_t word) {
    if (word == 0 || word > HIGHEST_PID)
        return std::nullopt;
    return static_cast<pid_t>(word);
}

/// One edge's part of a strut, as it is written.
struct EdgeClaim {
    std::uint32_t size = 0;
    std::uint32_t start = 0;
    std::uint32_t end = 0;
};

/// One edge's part of a strut, as it is believed: of a root that is so `deep` from that edge and so `long`
/// along it.
void Believe(const EdgeClaim& claim, int deep, int length, int& size, int& start, int& end) {
    if (deep <= 0 || length <= 0 || claim.size > static_cast<std::uint32_t>(deep) ||
        claim.start > claim.end || claim.start >= static_cast<std::uint32_t>(length))
        return;
    size = static_cast<int>(claim.size);
    start = static_cast<int>(claim.start);
    end = static_cast<int>(std::min(claim.end, static_cast<std::uint32_t>(length) - 1));
}

/// A stretch of whole pixels, the end exclusive.
struct Stretch {
    float start = 0;
    float end = 0;

    float Length() const { return end - start; }
    /// Whether pixels from one to another, both inclusive, have a part in it.
    bool Meets(int first, int last) const {
        return static_cast<float>(first) < end && static_cast<float>(last) >= start;
    }
};

/// How far a strip along the root's near edge reaches into a display.
float FromStart(int strip, const Stretch& display) {
    const float reach = static_cast<float>(strip) - display.start;
    return strip > 0 && reach > 0 && reach < display.Length() ? reach : 0;
}

/// The same of the far edge.
float FromEnd(int strip, const Stretch& display, int root) {
    const float reach = display.end - static_cast<float>(root - strip);
    return strip > 0 && reach > 0 && reach < display.Length() ? reach : 0;
}

} // namespace

Property Property::From(const xcb_get_property_reply_t* reply) {
    Property property;
    if (reply == nullptr || (reply->format != 8 && reply->format != 16 && reply->format != 32))
        return property;
    property.type = reply->type;
    property.format = reply->format;
    const std::size_t size = std::size_t{reply->value_len} * (reply->format / 8U);
    const std::span<const std::uint8_t> bytes = Part(BytesBehind(*reply), 0, size);
    property.bytes.assign(bytes.begin(), bytes.end());
    return property;
}

std::vector<std::uint32_t> Property::Words() const {
    if (format != 32)
        return {};
    std::vector<std::uint32_t> words(bytes.size() / sizeof(std::uint32_t));
    for (std::size_t place = 0; place < words.size(); ++place)
        words[place] = WordAt(bytes, place);
    return words;
}

std::optional<std::uint32_t> Property::FirstWord() const {
    if (format != 32 || bytes.size() < sizeof(std::uint32_t))
        return std::nullopt;
    return WordAt(bytes, 0);
}

std::vector<std::uint32_t> Property::Cardinals() const {
    return type == XCB_ATOM_CARDINAL ? Words() : std::vector<std::uint32_t>();
}

bool Property::Names(xcb_atom_t atom) const {
    if (type != XCB_ATOM_ATOM || atom == XCB_ATOM_NONE)
        return false;
    const std::vector<std::uint32_t> words = Words();
    return std::find(words.begin(), words.end(), atom) != words.end();
}

std::string TitleFrom(const Property& utf8Name, const Property& name, xcb_atom_t utf8String) {
    const std::string title = Readable(utf8Name, utf8String);
    return !title.empty() ? title : Readable(name, utf8String);
}

std::optional<pid_t> PidFrom(const Property& property) {
    const std::vector<std::uint32_t> words = property.Cardinals();
    return !words.empty() ? PidFrom(words[0]) : std::nullopt;
}

std::optional<pid_t> PidFromClientIds(std::span<const std::uint8_t> bytes) {
    constexpr std::size_t HEAD = 3; // client, mask, length
    std::size_t rest = bytes.size() / sizeof(std::uint32_t);
    std::size_t place = 0;
    while (rest > HEAD) {
        const std::uint32_t mask = WordAt(bytes, place + 1);
        const std::size_t values = WordAt(bytes, place + 2) / sizeof(std::uint32_t);
        place += HEAD;
        rest -= HEAD;
        if (values > rest)
            return std::nullopt;
        if ((mask & XCB_RES_CLIENT_ID_MASK_LOCAL_CLIENT_PID) != 0 && values > 0) {
            if (const std::optional<pid_t> pid = PidFrom(WordAt(bytes, place)))
                return pid;
        }
        place += values;
        rest -= values;
    }
    return std::nullopt;
}

pid_t OwnerFrom(const OwnerClaims& claims, pid_t ourselves) {
    const std::optional<pid_t> written = claims.isOtherMachine ? std::nullopt : claims.written;
    if (written == ourselves || claims.known == ourselves)
        return ourselves;
    return written ? *written : claims.known.value_or(0);
}

bool IsOtherMachine(const Property& machine, const std::string& host) {
    std::string_view name = TextOf(machine);
    name = name.substr(0, name.find('\0'));
    return !name.empty() && name != host;
}

std::string ClassFrom(const Property& property) {
    const std::string_view text = TextOf(property);
    const std::size_t end = text.find('\0');
    if (end == std::string_view::npos)
        return {};
    const std::string_view second = text.substr(end + 1);
    return WithoutControls(MendedUtf8(second.substr(0, second.find('\0'))));
}

float OpacityFrom(const Property& property) {
    const std::vector<std::uint32_t> words = property.Cardinals();
    if (words.empty())
        return 1.0F;
    return static_cast<float>(static_cast<double>(words[0]) / 0xFFFFFFFF);
}

WindowType TypeFrom(const Property& property, WindowTypeNames names) {
    if (property.type != XCB_ATOM_ATOM)
        return WindowType::Unset;
    for (const std::uint32_t word : property.Words()) {
        const auto known =
            std::find_if(names.begin(), names.end(), [word](const auto& each) { return each.first == word; });
        if (word != XCB_ATOM_NONE && known != names.end())
            return known->second;
    }
    return WindowType::Unset;
}

Edges EdgesFrom(const Property& property, int limit) {
    const std::vector<std::uint32_t> words = property.Cardinals();
    if (words.size() < 4 || limit < 0 ||
        std::any_of(words.begin(), words.begin() + 4,
                    [limit](std::uint32_t each) { return each > static_cast<std::uint32_t>(limit); }))
        return {};
    return {static_cast<int>(words[0]), static_cast<int>(words[1]), static_cast<int>(words[2]),
            static_cast<int>(words[3])};
}

Strut StrutFrom(const Property& partial, const Property& whole, int rootWidth, int rootHeight) {
    constexpr std::size_t WHOLE_WORDS = 4;
    constexpr std::size_t PARTIAL_WORDS = 12;
    constexpr std::uint32_t TO_THE_END = 0xFFFFFFFF;
    std::array<EdgeClaim, WHOLE_WORDS> claims; // left, right, top, bottom
    std::vector<std::uint32_t> words = partial.Cardinals();
    const bool isPartial = words.size() >= PARTIAL_WORDS;
    if (!isPartial)
        words = whole.Cardinals();
    if (words.size() < WHOLE_WORDS)
        return {};
    for (std::size_t edge = 0; edge < claims.size(); ++edge) {
        claims[edge].size = words[edge];
        claims[edge].start = isPartial ? words[WHOLE_WORDS + 2 * edge] : 0;
        claims[edge].end = isPartial ? words[WHOLE_WORDS + 2 * edge + 1] : TO_THE_END;
    }
    Strut strut;
    Believe(claims[0], rootWidth, rootHeight, strut.size.left, strut.leftStart, strut.leftEnd);
    Believe(claims[1], rootWidth, rootHeight, strut.size.right, strut.rightStart, strut.rightEnd);
    Believe(claims[2], rootHeight, rootWidth, strut.size.top, strut.topStart, strut.topEnd);
    Believe(claims[3], rootHeight, rootWidth, strut.size.bottom, strut.bottomStart, strut.bottomEnd);
    return strut;
}

CGRect VisibleBounds(const CGRect& display, std::span<const Strut> struts, int rootWidth, int rootHeight) {
    const Stretch across{display.origin.x, display.origin.x + display.size.width};
    const Stretch down{display.origin.y, display.origin.y + display.size.height};
    float left = 0;
    float right = 0;
    float top = 0;
    float bottom = 0;
    for (const Strut& strut : struts) {
        if (down.Meets(strut.leftStart, strut.leftEnd))
            left = std::max(left, FromStart(strut.size.left, across));
        if (down.Meets(strut.rightStart, strut.rightEnd))
            right = std::max(right, FromEnd(strut.size.right, across, rootWidth));
        if (across.Meets(strut.topStart, strut.topEnd))
            top = std::max(top, FromStart(strut.size.top, down));
        if (across.Meets(strut.bottomStart, strut.bottomEnd))
            bottom = std::max(bottom, FromEnd(strut.size.bottom, down, rootHeight));
    }
    if (left + right >= across.Length() || top + bottom >= down.Length())
        return display;
    return {{across.start + left, down.start + top},
            {across.Length() - left - right, down.Length() - top - bottom}};
}

} // namespace platform::x11
