// SPDX-License-Identifier: Apache-2.0
#include "platform/utf8.h"
#include "platform/x11/window_levels.h"
#include "platform/x11/window_properties.h"
#include "tests/fuzz/fuzz_check.h"
#include "tests/fuzz/fuzz_input.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <span>
#include <string>
#include <vector>

/// Anything at all as what clients write on their windows: what is made of it can be passed on.

namespace {

using namespace platform::x11;
using platform::CGRect;

constexpr xcb_atom_t UTF8_STRING = 7;
constexpr int ROOT_WIDTH = 1920;
constexpr int ROOT_HEIGHT = 1080;

/// A property the way it comes: a head that may lie about what is behind it. Its type is one of the first
/// atoms, so that the right ones are met.
Property NextProperty(Input& input) {
    xcb_get_property_reply_t head{};
    head.type = input.Byte() % 40U;
    head.format = static_cast<std::uint8_t>(input.Byte() % 5U * 8U);
    head.value_len = input.Byte() * (input.Byte() % 2U == 0 ? 1U : 0x01010101U);
    const std::span<const std::uint8_t> bytes = input.Bytes(input.Byte());
    head.length = static_cast<std::uint32_t>(bytes.size() / 4);
    std::vector<std::uint32_t> memory((sizeof head + bytes.size() / 4 * 4) / 4);
    std::memcpy(memory.data(), &head, sizeof head);
    if (head.length > 0)
        std::memcpy(reinterpret_cast<std::uint8_t*>(memory.data()) + sizeof head, bytes.data(),
                    std::size_t{head.length} * 4);
    const Property property =
        Property::From(reinterpret_cast<const xcb_get_property_reply_t*>(memory.data()));
    Require(property.bytes.size() <= bytes.size(), "a property is no longer than what has come");
    return property;
}

void RequirePassable(const std::string& text) {
    Require(platform::MendedUtf8(text) == text, "a text that is passed on is UTF-8");
    Require(platform::WithoutControls(text) == text, "a text that is passed on has no control characters");
}

void RequireWithin(int value, int limit, const char* claim) {
    Require(value >= 0 && value <= limit, claim);
}

void RequireStrut(const Strut& strut) {
    RequireWithin(strut.size.left, ROOT_WIDTH, "the left strut is in the root");
    RequireWithin(strut.size.right, ROOT_WIDTH, "the right strut is in the root");
    RequireWithin(strut.size.top, ROOT_HEIGHT, "the top strut is in the root");
    RequireWithin(strut.size.bottom, ROOT_HEIGHT, "the bottom strut is in the root");
    RequireWithin(strut.topEnd, ROOT_WIDTH - 1, "a strut ends in the root");
    RequireWithin(strut.leftEnd, ROOT_HEIGHT - 1, "a strut ends in the root");
    Require(strut.topStart <= strut.topEnd && strut.bottomStart <= strut.bottomEnd,
            "a strut ends after it begins");
}

void RequireVisible(const CGRect& display, const Strut& strut) {
    const CGRect visible = platform::x11::VisibleBounds(display, {&strut, 1}, ROOT_WIDTH, ROOT_HEIGHT);
    Require(visible.size.width > 0 && visible.size.height > 0, "something of a display stays visible");
    Require(visible.origin.x >= display.origin.x && visible.origin.y >= display.origin.y &&
                visible.origin.x + visible.size.width <= display.origin.x + display.size.width &&
                visible.origin.y + visible.size.height <= display.origin.y + display.size.height,
            "what is visible lies in the display");
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    Input input(data, size);
    while (!input.IsEmpty()) {
        const Property one = NextProperty(input);
        const Property other = NextProperty(input);
        RequirePassable(TitleFrom(one, other, UTF8_STRING));
        RequirePassable(ClassFrom(one));
        const float opacity = OpacityFrom(one);
        Require(opacity >= 0 && opacity <= 1, "opacity lies between none and all");
        const std::optional<pid_t> pid = platform::x11::PidFrom(one);
        Require(!pid || *pid > 0, "a pid is positive");
        const std::optional<pid_t> known = PidFromClientIds(one.bytes);
        Require(!known || *known > 0, "a pid is positive");
        const Edges edges = EdgesFrom(one, 256);
        RequireWithin(std::max({edges.left, edges.right, edges.top, edges.bottom}), 256, "shadows are small");
        RequireWithin(std::min({edges.left, edges.right, edges.top, edges.bottom}), 256,
                      "shadows are outside");
        const Strut strut = StrutFrom(one, other, ROOT_WIDTH, ROOT_HEIGHT);
        RequireStrut(strut);
        RequireVisible({{0, 0}, {1920, 1080}}, strut);
        RequireVisible({{960, 0}, {960, 600}}, strut);
        TypeFrom(one, std::vector<std::pair<xcb_atom_t, WindowType>>{{3, WindowType::Dock}});
        IsOtherMachine(one, "host");
    }
    return 0;
}
