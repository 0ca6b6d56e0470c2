// SPDX-License-Identifier: Apache-2.0
#include "platform/utf8.h"
#include "platform/x11/display_mirror.h"
#include "platform/x11/pointer_watch.h"
#include "platform/x11/server_replies.h"
#include "platform/x11/x11_greeting.h"
#include "tests/fuzz/fuzz_check.h"
#include "tests/fuzz/fuzz_input.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <span>
#include <string>
#include <vector>

/// Anything at all as what an X server answers and an authority file holds: nothing is read behind its end,
/// and what is made of it is lawful.

namespace {

using namespace platform::x11;

constexpr int ROOT_WIDTH = 1920;
constexpr int ROOT_HEIGHT = 1080;

/// A reply the way libxcb gives it: as long as its head says, and not a byte longer. Null when that is less
/// than such a reply has.
template <class Reply>
Malloced<Reply> NextReply(Input& input) {
    constexpr std::size_t HEAD = 32;
    const std::span<const std::uint8_t> head = input.Bytes(HEAD);
    const std::size_t words = input.Byte();
    const std::span<const std::uint8_t> rest = input.Bytes(words * 4);
    auto* const memory = static_cast<std::uint8_t*>(std::calloc(HEAD + words * 4, 1));
    Require(memory != nullptr, "there is memory");
    std::copy(head.begin(), head.end(), memory);
    std::copy(rest.begin(), rest.end(), memory + HEAD);
    reinterpret_cast<xcb_generic_reply_t*>(memory)->length = static_cast<std::uint32_t>(words);
    return WholeReply<Reply>(memory);
}

void FeedMonitors(Input& input) {
    const auto reply = NextReply<xcb_randr_get_monitors_reply_t>(input);
    const std::vector<ServerMonitor> monitors = MonitorsFrom(*reply, ROOT_WIDTH, ROOT_HEIGHT);
    Require(monitors.size() <= 64, "there are not too many monitors");
    for (const ServerMonitor& each : monitors) {
        Require(each.bounds.left >= 0 && each.bounds.left < each.bounds.right &&
                    each.bounds.right <= ROOT_WIDTH && each.bounds.top >= 0 &&
                    each.bounds.top < each.bounds.bottom && each.bounds.bottom <= ROOT_HEIGHT,
                "a monitor lies in the root");
    }
}

void FeedOutput(Input& input) {
    const auto reply = NextReply<xcb_randr_get_output_info_reply_t>(input);
    Require(NameFrom(reply.get()).size() <= (reply != nullptr ? std::size_t{reply->length} * 4 : 0),
            "a name is no longer than what has come");
}

void FeedAtomName(Input& input) {
    const auto reply = NextReply<xcb_get_atom_name_reply_t>(input);
    Require(NameFrom(reply.get()).size() <= std::size_t{reply->length} * 4,
            "a name is no longer than what has come");
}

void RequireProductName(std::span<const std::uint8_t> edid) {
    const std::string name = ProductNameFromEdid(edid);
    Require(name.size() <= 13, "a product's name is no longer than its field");
    Require(name.empty() || (name.front() != ' ' && name.back() != ' '), "a product's name is trimmed");
    Require(platform::WithoutControls(platform::MendedUtf8(name)) == name, "a product's name can be shown");
}

void FeedEdid(Input& input) {
    const auto reply = NextReply<xcb_randr_get_output_property_reply_t>(input);
    const std::string edid = EdidFrom(reply.get());
    Require(edid.size() <= std::size_t{reply->length} * 4, "an EDID is no longer than what has come");
    RequireProductName({reinterpret_cast<const std::uint8_t*>(edid.data()), edid.size()});
    RequireProductName(input.Bytes(input.Byte()));
}

/// Sums the items up, so that every byte of them is looked at.
template <class Item>
void RequireItems(const std::vector<Item>& items, std::size_t words) {
    Require(items.size() * sizeof(Item) <= words * 4, "there are no more items than have come");
    unsigned sum = 0;
    for (const Item& item : items) {
        const auto* const bytes = reinterpret_cast<const std::uint8_t*>(&item);
        for (std::size_t i = 0; i < sizeof item; ++i)
            sum += bytes[i];
    }
    Require(sum <= words * 4 * 255, "items are made of what has come");
}

void FeedLists(Input& input) {
    const auto tree = NextReply<xcb_query_tree_reply_t>(input);
    RequireItems(ChildrenFrom(*tree), tree->length);
    const auto properties = NextReply<xcb_list_properties_reply_t>(input);
    RequireItems(AtomsFrom(*properties), properties->length);
    const auto shape = NextReply<xcb_shape_get_rectangles_reply_t>(input);
    RequireItems(RectanglesFrom(*shape), shape->length);
}

void FeedCursor(Input& input) {
    const auto reply = NextReply<xcb_xfixes_get_cursor_image_reply_t>(input);
    const std::shared_ptr<platform::CursorImage> cursor = CursorFrom(reply.get());
    if (cursor == nullptr)
        return;
    const platform::Picture& picture = *cursor->representations.front();
    Require(std::size_t{reply->length} * 4 >= picture.stride * static_cast<std::size_t>(picture.height),
            "a cursor is no larger than what has come");
    Require(cursor->hotSpot.x <= static_cast<float>(picture.width) &&
                cursor->hotSpot.y <= static_cast<float>(picture.height),
            "a hot spot lies in its cursor");
    for (std::size_t i = 0; i < picture.stride * static_cast<std::size_t>(picture.height); i += 4) {
        const std::uint8_t* const pixel = picture.pixels + i;
        Require(std::max({pixel[0], pixel[1], pixel[2]}) <= pixel[3], "no colour exceeds its alpha");
    }
}

/// As libxcb walks it: a memory checker sees a step too far.
unsigned WalkThrough(const xcb_setup_t& setup) {
    unsigned sum = 0;
    for (auto formats = xcb_setup_pixmap_formats_iterator(&setup); formats.rem > 0; xcb_format_next(&formats))
        sum += formats.data->depth;
    for (auto screens = xcb_setup_roots_iterator(&setup); screens.rem > 0; xcb_screen_next(&screens)) {
        for (auto depths = xcb_screen_allowed_depths_iterator(screens.data); depths.rem > 0;
             xcb_depth_next(&depths)) {
            for (auto visuals = xcb_depth_visuals_iterator(depths.data); visuals.rem > 0;
                 xcb_visualtype_next(&visuals))
                sum += visuals.data->visual_id & 0xFFU;
        }
    }
    return sum;
}

void FeedWelcome(Input& input) {
    const std::span<const std::uint8_t> given = input.Bytes(std::size_t{4} * input.Byte());
    if (given.size() < ANSWER_HEAD)
        return;
    Bytes answer(given.begin(), given.end());
    const std::size_t units = (answer.size() - ANSWER_HEAD) / 4;
    answer.resize(ANSWER_HEAD + units * 4);
    const auto length = static_cast<std::uint16_t>(units);
    std::memcpy(answer.data() + 6, &length, sizeof length);
    Require(AnswerLength(std::span(answer).first<ANSWER_HEAD>()) == answer.size(), "the length is read");
    if (IsSoundWelcome(answer)) {
        const unsigned most = static_cast<unsigned>(answer.size()) * 255;
        Require(WalkThrough(*reinterpret_cast<const xcb_setup_t*>(answer.data())) <= most,
                "a welcome is made of what has come");
    }
}

void FeedAuthority(Input& input) {
    const std::span<const std::uint8_t> given = input.Bytes(input.Byte());
    const Bytes file(given.begin(), given.end());
    const Bytes cookie = FindCookie(file, "here", "7");
    Require(cookie.size() <= 256, "a cookie fits a greeting");
    Require(
        std::search(file.begin(), file.end(), cookie.begin(), cookie.end()) != file.end() || cookie.empty(),
        "a cookie comes out of its file");
    Require(MakeGreeting(cookie).size() % 4 == 0, "a greeting is padded");
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    using Feed = void (*)(Input&);
    constexpr Feed FEEDS[] = {FeedMonitors, FeedOutput, FeedAtomName, FeedEdid,
                              FeedLists,    FeedCursor, FeedWelcome,  FeedAuthority};
    Input input(data, size);
    while (!input.IsEmpty())
        FEEDS[input.Byte() % std::size(FEEDS)](input);
    return 0;
}
