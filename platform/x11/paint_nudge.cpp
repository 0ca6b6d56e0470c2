// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/paint_nudge.h"

#include "platform/x11/server_replies.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstring>
#include <vector>

namespace platform::x11 {

namespace {

/// A client decides how many windows it puts into one another; so many are looked at.
constexpr std::size_t MOST_WINDOWS = 256;
constexpr std::size_t MOST_RECTS = 8;

struct InnerWindow {
    xcb_window_t window = 0;
    PixelRect rect; // of the storage, less the border
};

struct ChildQuestion {
    InnerWindow parent;
    xcb_window_t window = 0;
    Pending<xcb_get_geometry_reply_t> geometry;
};

PixelRect Common(const PixelRect& one, const PixelRect& other) {
    return {std::max(one.left, other.left), std::max(one.top, other.top), std::min(one.right, other.right),
            std::min(one.bottom, other.bottom)};
}

std::vector<ChildQuestion> AskForChildren(X11Connection& connection, const std::vector<InnerWindow>& parents,
                                          std::size_t most) {
    std::vector<Pending<xcb_query_tree_reply_t>> trees;
    trees.reserve(parents.size());
    for (const InnerWindow& parent : parents) {
        trees.push_back(
            connection.Ask<xcb_query_tree_reply_t>(xcb_query_tree(connection.Get(), parent.window)));
    }
    std::vector<ChildQuestion> questions;
    for (std::size_t i = 0; i < parents.size(); ++i) {
        const Malloced<xcb_query_tree_reply_t> tree = connection.Await(trees[i]);
        if (tree == nullptr)
            continue;
        for (const xcb_window_t child : ChildrenFrom(*tree)) {
            if (questions.size() == most)
                return questions;
            questions.push_back(
                {parents[i], child,
                 connection.Ask<xcb_get_geometry_reply_t>(xcb_get_geometry(connection.Get(), child))});
        }
    }
    return questions;
}

std::vector<InnerWindow> ChildrenOf(X11Connection& connection, const std::vector<InnerWindow>& parents,
                                    std::size_t most) {
    std::vector<InnerWindow> children;
    for (ChildQuestion& question : AskForChildren(connection, parents, most)) {
        const Malloced<xcb_get_geometry_reply_t> geometry = connection.Await(question.geometry);
        if (geometry == nullptr)
            continue;
        const int left = question.parent.rect.left + geometry->x + geometry->border_width;
        const int top = question.parent.rect.top + geometry->y + geometry->border_width;
        children.push_back({question.window, {left, top, left + geometry->width, top + geometry->height}});
    }
    return children;
}

std::vector<InnerWindow> WindowsIn(X11Connection& connection, const InnerWindow& topLevel) {
    std::vector<InnerWindow> all{topLevel};
    std::vector<InnerWindow> level{topLevel};
    while (!level.empty() && all.size() < MOST_WINDOWS) {
        level = ChildrenOf(connection, level, MOST_WINDOWS - all.size());
        all.insert(all.end(), level.begin(), level.end());
    }
    return all;
}

void TellExposure(X11Connection& connection, xcb_window_t window, const PixelRect& rect, std::size_t left) {
    xcb_expose_event_t event{};
    event.response_type = XCB_EXPOSE;
    event.window = window;
    event.x = static_cast<std::uint16_t>(rect.left);
    event.y = static_cast<std::uint16_t>(rect.top);
    event.width = static_cast<std::uint16_t>(rect.right - rect.left);
    event.height = static_cast<std::uint16_t>(rect.bottom - rect.top);
    event.count = static_cast<std::uint16_t>(left);
    std::array<char, 32> message{}; // what the protocol sends is longer than the event
    std::memcpy(message.data(), &event, sizeof(event));
    xcb_send_event(connection.Get(), 0, window, XCB_EVENT_MASK_EXPOSURE, message.data());
}

void ClearAndExpose(X11Connection& connection, xcb_window_t window, const PixelRect& rect) {
    xcb_clear_area(connection.Get(), 1, window, static_cast<std::int16_t>(rect.left),
                   static_cast<std::int16_t>(rect.top), static_cast<std::uint16_t>(rect.right - rect.left),
                   static_cast<std::uint16_t>(rect.bottom - rect.top));
}

} // namespace

void NudgeToPaint(X11Connection& connection, xcb_window_t topLevel, int border, const PixelRegion& region,
                  PaintProof::Nudge nudge) {
    std::vector<PixelRect> rects = region.Rects();
    if (rects.size() > MOST_RECTS)
        rects.assign(1, region.Bounds());
    const PixelRect bounds = region.Bounds();
    const InnerWindow top{topLevel, {border, border, bounds.right, bounds.bottom}};
    for (const InnerWindow& inner : WindowsIn(connection, top)) {
        std::vector<PixelRect> mine;
        for (const PixelRect& rect : rects) {
            const PixelRect common = Common(rect, inner.rect);
            if (common.left < common.right && common.top < common.bottom)
                mine.push_back({common.left - inner.rect.left, common.top - inner.rect.top,
                                common.right - inner.rect.left, common.bottom - inner.rect.top});
        }
        for (std::size_t i = 0; i < mine.size(); ++i) {
            if (nudge == PaintProof::Nudge::TellExposure)
                TellExposure(connection, inner.window, mine[i], mine.size() - 1 - i);
            else
                ClearAndExpose(connection, inner.window, mine[i]);
        }
    }
    connection.Flush();
}

} // namespace platform::x11
