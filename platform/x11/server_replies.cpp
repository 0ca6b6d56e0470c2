// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/server_replies.h"

#include "platform/x11/reply_bytes.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <span>

namespace platform::x11 {

namespace {

constexpr std::size_t MOST_MONITORS = 64;

/// The first `count` items, or as many as there are whole ones.
template <class Item>
std::vector<Item> ItemsFrom(std::span<const std::uint8_t> bytes, std::size_t count) {
    std::vector<Item> items(std::min(count, bytes.size() / sizeof(Item)));
    if (!items.empty())
        std::memcpy(items.data(), bytes.data(), items.size() * sizeof(Item));
    return items;
}

} // namespace

std::vector<ServerMonitor> MonitorsFrom(const xcb_randr_get_monitors_reply_t& reply, int rootWidth,
                                        int rootHeight) {
    std::vector<ServerMonitor> list;
    const std::span<const std::uint8_t> bytes = BytesBehind(reply);
    std::size_t place = 0;
    while (list.size() < MOST_MONITORS && bytes.size() - place >= sizeof(xcb_randr_monitor_info_t)) {
        xcb_randr_monitor_info_t info{};
        std::memcpy(&info, bytes.data() + place, sizeof info);
        place += sizeof info;
        const std::size_t outputs = std::size_t{info.nOutput} * sizeof(xcb_randr_output_t);
        if (bytes.size() - place < outputs)
            break;
        ServerMonitor each{info.name, info.primary != 0, {}, 0};
        each.bounds = {std::max<int>(info.x, 0), std::max<int>(info.y, 0),
                       std::min(info.x + info.width, rootWidth), std::min(info.y + info.height, rootHeight)};
        if (outputs > 0)
            std::memcpy(&each.output, bytes.data() + place, sizeof each.output);
        place += outputs;
        if (each.bounds.left < each.bounds.right && each.bounds.top < each.bounds.bottom)
            list.push_back(each);
    }
    return list;
}

std::string NameFrom(const xcb_get_atom_name_reply_t* reply) {
    return reply != nullptr ? std::string(TextOf(Part(BytesBehind(*reply), 0, reply->name_len)))
                            : std::string();
}

std::string NameFrom(const xcb_randr_get_output_info_reply_t* reply) {
    if (reply == nullptr)
        return {};
    const std::size_t before = std::size_t{reply->num_crtcs} + reply->num_modes + reply->num_clones;
    return std::string(TextOf(Part(BytesBehind(*reply), before * sizeof(std::uint32_t), reply->name_len)));
}

std::string EdidFrom(const xcb_randr_get_output_property_reply_t* reply) {
    if (reply == nullptr || reply->format != 8)
        return {};
    return std::string(TextOf(Part(BytesBehind(*reply), 0, reply->num_items)));
}

std::vector<xcb_window_t> ChildrenFrom(const xcb_query_tree_reply_t& reply) {
    return ItemsFrom<xcb_window_t>(BytesBehind(reply), reply.children_len);
}

std::vector<xcb_atom_t> AtomsFrom(const xcb_list_properties_reply_t& reply) {
    return ItemsFrom<xcb_atom_t>(BytesBehind(reply), reply.atoms_len);
}

std::vector<xcb_rectangle_t> RectanglesFrom(const xcb_shape_get_rectangles_reply_t& reply) {
    return ItemsFrom<xcb_rectangle_t>(BytesBehind(reply), reply.rectangles_len);
}

std::vector<xcb_rectangle_t> RectanglesFrom(const xcb_xfixes_fetch_region_reply_t& reply) {
    const std::span<const std::uint8_t> bytes = BytesBehind(reply);
    return ItemsFrom<xcb_rectangle_t>(bytes, bytes.size() / sizeof(xcb_rectangle_t));
}

} // namespace platform::x11
