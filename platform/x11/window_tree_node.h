// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/x11/window_tree.h"

#include <cstdint>
#include <optional>
#include <unordered_set>

/// What the parts of WindowTree share.
namespace platform::x11 {

/// What can be asked about a window, as bits.
enum Want : unsigned {
    WantBasics = 1U << 0U,
    WantShape = 1U << 1U,
    WantClient = 1U << 2U, ///< Who carries the properties, and whether it is managed.
    WantOwner = 1U << 3U,
    WantState = 1U << 4U,
    WantDesktop = 1U << 5U,
    WantType = 1U << 6U,
    WantOpacity = 1U << 7U,
    WantShadow = 1U << 8U,
    WantTitle = 1U << 9U,
    WantClass = 1U << 10U,
    WantStrut = 1U << 11U,

    WantProperties = WantOwner | WantState | WantDesktop | WantType | WantOpacity | WantShadow | WantTitle |
                     WantClass | WantStrut,
    WantAll = WantBasics | WantShape | WantClient | WantProperties,
    /// What nobody covers anybody by.
    WantLater = WantTitle | WantClass | WantStrut,
    WantFirst = WantAll & ~(WantTitle | WantClass | WantStrut),
};

struct WindowTree::Node : TopLevel {
    unsigned wants = WantAll;
    /// Nobody sees it, nor is it in anybody's care: nothing is asked until then.
    bool asleep = true;
    bool sizeUnknown = false; ///< What the basics tell of it holds, until an event does.
    bool shapeWatched = false;
    std::optional<std::uint32_t> desktop;
    /// Windows below it that we hear of, since one of them is its client or may become it.
    std::unordered_set<xcb_window_t> inside;
    /// Windows below it that we listen to, since none of them was its client when we looked.
    std::unordered_set<xcb_window_t> candidates;
};

} // namespace platform::x11
