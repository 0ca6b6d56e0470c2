// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/window_tree_reader.h"

#include <algorithm>
#include <cstdio>
#include <random>
#include <string>
#include <unordered_set>

/// The root, the list of its children, and who is below whom. Clients inside frames and
/// properties are in files of their own.
namespace platform::x11 {

namespace {

std::string NewServerMark() {
    std::random_device random;
    std::string mark = "_SCREENSHARE_";
    for (int part = 0; part < 4; ++part) {
        std::array<char, 9> text{};
        std::snprintf(text.data(), text.size(), "%08x", static_cast<unsigned>(random()));
        mark += text.data();
    }
    return mark;
}

} // namespace

WindowTree::Reader::Reader(WindowTree& tree) : m_tree(tree), m_connection(tree.m_connection) {}

void WindowTree::Reader::Pace() {
    constexpr unsigned MOST_UNSENT = 256; // of at most 40 bytes each
    if (++m_unsent < MOST_UNSENT)
        return;
    m_unsent = 0;
    m_connection.Flush();
}

Pending<xcb_get_property_reply_t> WindowTree::Reader::AskProperty(xcb_window_t window, xcb_atom_t atom,
                                                                  std::uint32_t length) {
    Pace();
    return m_connection.Ask<xcb_get_property_reply_t>(
        xcb_get_property(m_connection.Get(), 0, window, atom, XCB_GET_PROPERTY_TYPE_ANY, 0, length));
}

void WindowTree::Reader::RecognizeServer() {
    std::string& mark = m_tree.m_memory.serverMark;
    const auto find = [&](bool make) {
        const auto reply = m_connection.Fetch<xcb_intern_atom_reply_t>(xcb_intern_atom(
            m_connection.Get(), make ? 0 : 1, static_cast<std::uint16_t>(mark.size()), mark.data()));
        return reply != nullptr && reply->atom != XCB_ATOM_NONE;
    };
    if (!mark.empty() && find(false))
        return;
    m_tree.m_memory.windowIds.ReleaseIf([](std::uint32_t) { return true; });
    mark = NewServerMark();
    find(true);
}

unsigned WindowTree::Reader::ReadList() {
    const xcb_query_tree_cookie_t cookie = xcb_query_tree(m_connection.Get(), m_connection.Root());
    const unsigned sequence = cookie.sequence;
    const auto reply = m_connection.Fetch<xcb_query_tree_reply_t>(cookie);
    if (reply == nullptr)
        return sequence;
    for (const xcb_window_t window : ChildrenFrom(*reply)) {
        if (m_tree.NodeOf(window) != nullptr || m_tree.IsOfServer(window))
            continue;
        Pace();
        m_tree.Wake(m_tree.Add(window));
    }
    return sequence;
}

// ---- The root

/// The pixmap that a property names, if it is a picture of the whole root.
xcb_pixmap_t WindowTree::Reader::WallpaperFrom(const Property& property) {
    const xcb_pixmap_t pixmap = property.type == XCB_ATOM_PIXMAP ? property.FirstWord().value_or(0) : 0;
    if (pixmap == 0)
        return 0;
    const auto geometry =
        m_connection.Fetch<xcb_get_geometry_reply_t>(xcb_get_geometry(m_connection.Get(), pixmap));
    const bool fits = geometry != nullptr && geometry->width == m_tree.m_rootWidth &&
                      geometry->height == m_tree.m_rootHeight &&
                      geometry->depth == m_connection.Screen().root_depth;
    return fits ? pixmap : 0;
}

void WindowTree::Reader::ReadRoot() {
    const xcb_window_t root = m_connection.Root();
    auto desktop = AskProperty(root, m_connection.Atom(AtomName::NET_CURRENT_DESKTOP), 1);
    auto picture = AskProperty(root, m_connection.Atom(AtomName::XROOTPMAP_ID), 1);
    auto otherPicture = AskProperty(root, m_connection.Atom(AtomName::ESETROOT_PMAP_ID), 1);
    const std::vector<std::uint32_t> current = Property::From(Take(desktop).get()).Cardinals();
    xcb_pixmap_t wallpaper = WallpaperFrom(Property::From(Take(picture).get()));
    const xcb_pixmap_t other = WallpaperFrom(Property::From(Take(otherPicture).get()));
    wallpaper = wallpaper != 0 ? wallpaper : other;
    m_tree.m_wallpaper = wallpaper;
    m_tree.m_desktop = current.empty() ? std::nullopt : std::optional<std::uint32_t>(current[0]);
    m_tree.m_rootUnknown = false;
    for (Node& node : m_tree.m_backFirst)
        m_tree.PlaceOnDesktop(node);
    ++m_tree.m_revision;
}

// ---- Windows out of sight

void WindowTree::Reader::FollowWanderers() {
    struct Path {
        xcb_window_t window = 0;
        xcb_window_t ancestor = 0;
        Pending<xcb_query_tree_reply_t> tree;
    };
    std::vector<Path> paths;
    for (const xcb_window_t window : m_tree.m_wandering)
        paths.push_back({window, window, {}});
    for (int depth = 0; depth <= DEEPEST_CLIENT && !paths.empty(); ++depth) {
        for (Path& path : paths) {
            Pace();
            path.tree =
                m_connection.Ask<xcb_query_tree_reply_t>(xcb_query_tree(m_connection.Get(), path.ancestor));
        }
        std::vector<Path> further;
        for (Path& path : paths) {
            const auto reply = Take(path.tree);
            const bool isGone = reply == nullptr && path.ancestor == path.window;
            if (isGone) {
                m_tree.Detach(path.window);
                m_tree.m_memory.windowIds.Release(path.window);
            }
            if (reply == nullptr)
                continue;
            if (reply->parent != m_connection.Root()) {
                path.ancestor = reply->parent;
                further.push_back(std::move(path));
                continue;
            }
            Node* const frame = m_tree.NodeOf(path.ancestor);
            if (frame != nullptr && path.ancestor != path.window)
                m_tree.Adopt(*frame, path.window);
        }
        paths = std::move(further);
    }
    m_tree.m_wandering.clear();
}

// ---- Size, kind and mapping

struct WindowTree::Reader::BasicAnswers {
    Node* node = nullptr;
    unsigned asked = 0;
    unsigned sequence = 0; // of the geometry
    Pending<xcb_get_window_attributes_reply_t> attributes;
    Pending<xcb_get_geometry_reply_t> geometry;
    Pending<xcb_shape_query_extents_reply_t> shape;
};

void WindowTree::Reader::ReadBasics() {
    std::vector<Node*> nodes;
    for (Node& node : m_tree.m_backFirst)
        nodes.push_back(&node);
    InBatches(nodes, [this](Batch batch) { ReadBasicsOf(batch, true); });
}

void WindowTree::Reader::ReadBasicsOf(Batch batch, bool isFirst) {
    std::vector<BasicAnswers> answers;
    for (Node* const node : batch) {
        if ((node->wants & (WantBasics | WantShape)) != 0)
            answers.push_back(AskBasics(*node));
    }
    for (BasicAnswers& each : answers) {
        if ((each.asked & WantBasics) != 0)
            ApplyBasics(each, isFirst);
        if ((each.asked & WantShape) != 0)
            ApplyShapeExtents(each);
    }
}

WindowTree::Reader::BasicAnswers WindowTree::Reader::AskBasics(Node& node) {
    xcb_connection_t* const connection = m_connection.Get();
    BasicAnswers answers;
    answers.node = &node;
    answers.asked = node.wants;
    if ((node.wants & WantBasics) != 0) {
        Pace();
        answers.attributes = m_connection.Ask<xcb_get_window_attributes_reply_t>(
            xcb_get_window_attributes(connection, node.window));
        const xcb_get_geometry_cookie_t geometry = xcb_get_geometry(connection, node.window);
        answers.sequence = geometry.sequence;
        answers.geometry = m_connection.Ask<xcb_get_geometry_reply_t>(geometry);
    }
    if ((node.wants & WantShape) == 0 || !m_connection.Has().shape)
        return answers;
    Pace();
    if (!node.shapeWatched)
        xcb_shape_select_input(connection, node.window, 1);
    node.shapeWatched = true;
    answers.shape =
        m_connection.Ask<xcb_shape_query_extents_reply_t>(xcb_shape_query_extents(connection, node.window));
    return answers;
}

void WindowTree::Reader::ApplyBasics(BasicAnswers& answers, bool isFirst) {
    Node& node = *answers.node;
    const auto attributes = Take(answers.attributes);
    const auto geometry = Take(answers.geometry);
    if (attributes == nullptr || geometry == nullptr) {
        PutToSleep(node); // it is gone, which an event is about to tell
        return;
    }
    node.wants &= ~unsigned{WantBasics};
    node.depth = geometry->depth;
    node.visual = attributes->visual;
    node.inputOnly = attributes->_class == XCB_WINDOW_CLASS_INPUT_ONLY;
    if (node.inputOnly)
        node.wants = 0;
    if (isFirst) {
        node.x = geometry->x;
        node.y = geometry->y;
        node.width = geometry->width;
        node.height = geometry->height;
        node.border = geometry->border_width;
        node.mapped = attributes->map_state != XCB_MAP_STATE_UNMAPPED;
        node.overrideRedirect = attributes->override_redirect != 0;
    } else if (node.sizeUnknown) {
        m_tree.Reshape(node, geometry->width, geometry->height, geometry->border_width, answers.sequence);
    }
}

/// Whether it has a shape; which one is asked with the properties.
void WindowTree::Reader::ApplyShapeExtents(BasicAnswers& answers) {
    Node& node = *answers.node;
    const auto reply = Take(answers.shape);
    node.shaped = reply != nullptr && reply->bounding_shaped != 0;
    if (node.shaped)
        return;
    node.shape.clear();
    node.shapeBounds = {};
    node.wants &= ~unsigned{WantShape};
}

void WindowTree::Reader::PutToSleep(Node& node) {
    node.asleep = true;
    m_tree.m_toAsk.erase(node.window);
}

} // namespace platform::x11
