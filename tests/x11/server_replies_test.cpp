// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/server_replies.h"

#include "platform/x11/x11_connection.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

/// Replies of a server that says more than it sends. A memory checker sees a step too far.

namespace {

using namespace platform::x11;

constexpr std::size_t SHORTEST = 32;

/// As libxcb receives it: as long as its head says, and not a byte longer.
void* Received(const void* head, std::size_t size, const std::vector<std::uint32_t>& rest) {
    auto* const memory = static_cast<std::uint8_t*>(std::calloc(SHORTEST + rest.size() * 4, 1));
    if (memory == nullptr)
        std::abort();
    std::memcpy(memory, head, std::min(size, SHORTEST));
    if (!rest.empty())
        std::memcpy(memory + SHORTEST, rest.data(), rest.size() * 4);
    reinterpret_cast<xcb_generic_reply_t*>(memory)->length = static_cast<std::uint32_t>(rest.size());
    return memory;
}

template <class Reply>
Malloced<Reply> ReplyOf(const Reply& head, const std::vector<std::uint32_t>& rest) {
    return WholeReply<Reply>(Received(&head, sizeof head, rest));
}

TEST(WholeReply, IsNullWhenLessHasComeThanItsFieldsTake) {
    const xcb_randr_get_output_info_reply_t head{};
    static_assert(sizeof head > SHORTEST);
    EXPECT_EQ(ReplyOf(head, {}), nullptr);
    EXPECT_NE(ReplyOf(head, {0}), nullptr);
    const xcb_get_window_attributes_reply_t attributes{};
    EXPECT_EQ(ReplyOf(attributes, {0, 0}), nullptr);
    EXPECT_NE(ReplyOf(attributes, {0, 0, 0}), nullptr);
    EXPECT_NE(ReplyOf(xcb_get_geometry_reply_t{}, {}), nullptr);
    EXPECT_EQ(WholeReply<xcb_get_geometry_reply_t>(nullptr), nullptr);
}

TEST(ChildrenFrom, GivesNoMoreThanHasCome) {
    xcb_query_tree_reply_t head{};
    head.children_len = 65535;
    EXPECT_EQ(ChildrenFrom(*ReplyOf(head, {7, 8})), (std::vector<xcb_window_t>{7, 8}));
    head.children_len = 1;
    EXPECT_EQ(ChildrenFrom(*ReplyOf(head, {7, 8})), std::vector<xcb_window_t>{7});
    EXPECT_TRUE(ChildrenFrom(*ReplyOf(head, {})).empty());
}

TEST(AtomsFrom, GivesNoMoreThanHasCome) {
    xcb_list_properties_reply_t head{};
    head.atoms_len = 65535;
    EXPECT_EQ(AtomsFrom(*ReplyOf(head, {39, 31})), (std::vector<xcb_atom_t>{39, 31}));
    EXPECT_TRUE(AtomsFrom(*ReplyOf(head, {})).empty());
}

TEST(RectanglesFrom, GivesNoMoreThanHasCome) {
    xcb_shape_get_rectangles_reply_t head{};
    head.rectangles_len = 0xFFFFFFFF;
    const auto found = RectanglesFrom(*ReplyOf(head, {0x00020001, 0x00040003, 0x00010001}));
    ASSERT_EQ(found.size(), 1u) << "a half is none";
    EXPECT_EQ(found[0].x, 1);
    EXPECT_EQ(found[0].y, 2);
    EXPECT_EQ(found[0].width, 3);
    EXPECT_EQ(found[0].height, 4);
}

TEST(MonitorsFrom, EndsWhereAMonitorHasMoreOutputsThanHaveCome) {
    xcb_randr_monitor_info_t one{};
    one.nOutput = 1;
    one.width = 100;
    one.height = 50;
    std::vector<std::uint32_t> rest(sizeof one / 4);
    std::memcpy(rest.data(), &one, sizeof one);
    rest.push_back(77);
    one.nOutput = 65535;
    rest.resize(rest.size() + sizeof one / 4);
    std::memcpy(&rest[sizeof one / 4 + 1], &one, sizeof one);
    const auto reply = ReplyOf(xcb_randr_get_monitors_reply_t{}, rest);
    const auto monitors = MonitorsFrom(*reply, 1000, 1000);
    ASSERT_EQ(monitors.size(), 1u);
    EXPECT_EQ(monitors[0].output, 77u);
    EXPECT_TRUE(MonitorsFrom(*reply, 0, 0).empty()) << "nothing of it lies in the root";
}

TEST(NameFrom, IsWhatHasComeOfIt) {
    xcb_get_atom_name_reply_t atom{};
    atom.name_len = 60000;
    EXPECT_EQ(NameFrom(ReplyOf(atom, {0x50446565}).get()), "eeDP");
    EXPECT_EQ(NameFrom(static_cast<xcb_get_atom_name_reply_t*>(nullptr)), "");
    xcb_randr_get_output_info_reply_t output{};
    output.num_crtcs = 1;
    output.num_modes = 1;
    constexpr std::uint32_t NO_CLONES_SIX_LETTERS = 0x00060000;
    EXPECT_EQ(NameFrom(ReplyOf(output, {NO_CLONES_SIX_LETTERS, 1, 2, 0x494D4448, 0x0000312D}).get()),
              "HDMI-1");
    EXPECT_EQ(NameFrom(ReplyOf(output, {NO_CLONES_SIX_LETTERS, 1, 2, 0x494D4448}).get()), "HDMI");
    EXPECT_EQ(NameFrom(ReplyOf(output, {NO_CLONES_SIX_LETTERS}).get()), "");
}

} // namespace
