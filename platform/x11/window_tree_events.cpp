// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/server_event.h"
#include "platform/x11/window_tree_node.h"

#include <xcb/shape.h>

#include <algorithm>
#include <iterator>

/// What events change in the tree. The `event` field of a structure event tells through whom we hear of it:
/// the root's tell of its children, all others of what is inside of those.
namespace platform::x11 {

/// An event from before the windows were read tells what is known already.
bool WindowTree::IsVoid(unsigned sequence) {
    if (m_voidBefore && static_cast<int>(sequence - *m_voidBefore) >= 0)
        m_voidBefore.reset();
    return m_voidBefore.has_value();
}

bool WindowTree::OnEvent(const xcb_generic_event_t& event) {
    if (!m_begun || IsSentByClient(event) || IsVoid(event.full_sequence))
        return false;
    switch (event.response_type) {
        case XCB_CREATE_NOTIFY:
            OnCreate(As<xcb_create_notify_event_t>(event));
            return true;
        case XCB_DESTROY_NOTIFY:
            OnDestroy(As<xcb_destroy_notify_event_t>(event));
            return true;
        case XCB_MAP_NOTIFY:
            OnMap(As<xcb_map_notify_event_t>(event), event.full_sequence);
            return true;
        case XCB_UNMAP_NOTIFY:
            OnUnmap(As<xcb_unmap_notify_event_t>(event));
            return true;
        case XCB_REPARENT_NOTIFY:
            OnReparent(As<xcb_reparent_notify_event_t>(event));
            return true;
        case XCB_CONFIGURE_NOTIFY:
            OnConfigure(As<xcb_configure_notify_event_t>(event), event.full_sequence);
            return As<xcb_configure_notify_event_t>(event).window != m_connection.Root();
        case XCB_GRAVITY_NOTIFY:
            OnGravity(As<xcb_gravity_notify_event_t>(event));
            return true;
        case XCB_CIRCULATE_NOTIFY:
            OnCirculate(As<xcb_circulate_notify_event_t>(event));
            return true;
        case XCB_PROPERTY_NOTIFY:
            return OnProperty(As<xcb_property_notify_event_t>(event));
        default:
            break;
    }
    const std::uint8_t shapeEvent = m_connection.Has().shapeEvent;
    if (shapeEvent == 0 || event.response_type != shapeEvent)
        return false;
    OnShape(event);
    return true;
}

// ---- Coming and going

void WindowTree::OnCreate(const xcb_create_notify_event_t& event) {
    if (event.parent != m_connection.Root() || IsOfServer(event.window))
        return;
    // Whatever had this name has ended somewhere out of our sight.
    Detach(event.window);
    Remove(event.window);
    m_memory.windowIds.Release(event.window);

    Node& node = Add(event.window);
    node.x = event.x;
    node.y = event.y;
    node.width = event.width;
    node.height = event.height;
    node.border = event.border_width;
    node.overrideRedirect = event.override_redirect != 0;
    m_watcher.OnAdded(node);
    // It may have been taken into somebody's care before we began to listen.
    Wake(node);
}

void WindowTree::OnDestroy(const xcb_destroy_notify_event_t& event) {
    Detach(event.window);
    Remove(event.window);
    m_memory.windowIds.Release(event.window);
}

void WindowTree::OnReparent(const xcb_reparent_notify_event_t& event) {
    const xcb_window_t root = m_connection.Root();
    if (event.parent != root) {
        if (event.event == root || event.override_redirect == 0)
            Follow(event.window, event.parent);
        return;
    }
    Detach(event.window);
    if (event.event != root || IsOfServer(event.window))
        return;
    Node* node = NodeOf(event.window);
    const bool isNew = node == nullptr;
    if (isNew)
        node = &Add(event.window);
    else
        m_backFirst.splice(m_backFirst.end(), m_backFirst, m_byWindow[event.window]);
    node->x = event.x;
    node->y = event.y;
    node->overrideRedirect = event.override_redirect != 0;
    if (isNew) {
        node->sizeUnknown = true;
        m_watcher.OnAdded(*node);
        Wake(*node);
    }
    NoteStackChange();
}

/// A window has gone below another one: into its frame, as a rule.
void WindowTree::Follow(xcb_window_t window, xcb_window_t parent) {
    // Even one that was found in there already, ahead of this, has been a child of the root until now.
    Remove(window);
    Node* const frame = NodeOf(parent);
    if (frame != nullptr && frame->inside.count(window) != 0)
        return;
    Detach(window);
    if (frame != nullptr)
        Adopt(*frame, window);
    else
        m_wandering.insert(window);
}

// ---- Being seen

/// Of several clients in a frame another one may be on show now.
void WindowTree::OnShownInside(Node& frame, xcb_window_t window) {
    if (window == frame.client && frame.inside.size() < 2)
        return;
    NoteChange(frame);
    Want(frame, WantClient);
}

void WindowTree::OnMap(const xcb_map_notify_event_t& event, unsigned sequence) {
    Node* const frame = event.event != event.window ? NodeOf(event.event) : nullptr;
    if (frame != nullptr && event.override_redirect == 0)
        OnShownInside(*frame, event.window);
    Node* const shown = event.event == m_connection.Root() ? NodeOf(event.window) : nullptr;
    if (shown == nullptr || shown->mapped)
        return;
    shown->mapped = true;
    shown->overrideRedirect = event.override_redirect != 0;
    m_watcher.OnStorageRenewed(*shown, sequence);
    NoteChange(*shown);
    Wake(*shown);
}

void WindowTree::OnUnmap(const xcb_unmap_notify_event_t& event) {
    Node* const frame = event.event != event.window ? NodeOf(event.event) : nullptr;
    if (frame != nullptr && frame->inside.count(event.window) != 0)
        OnShownInside(*frame, event.window);
    Node* const node = event.event == m_connection.Root() ? NodeOf(event.window) : nullptr;
    if (node == nullptr || !node->mapped)
        return;
    NoteChange(*node);
    node->mapped = false;
    m_watcher.OnUnmapped(*node);
    // One that was seen for a moment only may be managed without our knowing yet.
    if (node->known && !node->managed) {
        node->asleep = true;
        m_toAsk.erase(node->window);
    }
}

// ---- Place and size

void WindowTree::OnConfigure(const xcb_configure_notify_event_t& event, unsigned sequence) {
    if (event.event != m_connection.Root())
        return;
    if (event.window == m_connection.Root())
        return OnRootResized(event.width, event.height);
    const auto found = m_byWindow.find(event.window);
    if (found == m_byWindow.end())
        return;
    Node& node = *found->second;
    NoteChange(node);
    node.x = event.x;
    node.y = event.y;
    node.overrideRedirect = event.override_redirect != 0;
    Reshape(node, event.width, event.height, event.border_width, sequence);
    MoveAbove(found->second, event.above_sibling);
}

void WindowTree::Reshape(Node& node, int width, int height, int border, unsigned sequence) {
    node.sizeUnknown = false;
    if (node.width == width && node.height == height && node.border == border)
        return;
    // A shape is counted from inside the border, and we count from outside.
    const int shift = border - node.border;
    for (PixelRect& rect : node.shape)
        rect = {rect.left + shift, rect.top + shift, rect.right + shift, rect.bottom + shift};
    if (!node.shape.empty()) {
        PixelRect& bounds = node.shapeBounds;
        bounds = {bounds.left + shift, bounds.top + shift, bounds.right + shift, bounds.bottom + shift};
    }
    node.width = width;
    node.height = height;
    node.border = border;
    m_watcher.OnStorageRenewed(node, sequence);
}

void WindowTree::OnRootResized(int width, int height) {
    if (width == m_rootWidth && height == m_rootHeight)
        return;
    m_rootWidth = width;
    m_rootHeight = height;
    m_rootUnknown = true;
    // What is believed of a strut depends on the size.
    for (Node& node : m_backFirst)
        Want(node, WantStrut);
    NoteStackChange();
}

void WindowTree::OnGravity(const xcb_gravity_notify_event_t& event) {
    Node* const node = event.event == m_connection.Root() ? NodeOf(event.window) : nullptr;
    if (node == nullptr)
        return;
    node->x = event.x;
    node->y = event.y;
    NoteChange(*node);
}

void WindowTree::OnCirculate(const xcb_circulate_notify_event_t& event) {
    const auto found = m_byWindow.find(event.window);
    if (event.event != m_connection.Root() || found == m_byWindow.end())
        return;
    const Place place = event.place == XCB_PLACE_ON_TOP ? m_backFirst.end() : m_backFirst.begin();
    m_backFirst.splice(place, m_backFirst, found->second);
    NoteChange(*found->second);
}

void WindowTree::OnShape(const xcb_generic_event_t& event) {
    const auto& shape = As<xcb_shape_notify_event_t>(event);
    Node* const node = shape.shape_kind == XCB_SHAPE_SK_BOUNDING ? NodeOf(shape.affected_window) : nullptr;
    if (node == nullptr)
        return;
    NoteChange(*node);
    Want(*node, WantShape);
}

// ---- Properties

unsigned WindowTree::MeaningOf(xcb_atom_t atom) const {
    const std::pair<xcb_atom_t, unsigned> meanings[] = {
        {m_connection.Atom(AtomName::WM_STATE), WantClient},
        {m_connection.Atom(AtomName::NET_WM_PID), WantOwner},
        {XCB_ATOM_WM_CLIENT_MACHINE, WantOwner},
        {m_connection.Atom(AtomName::NET_WM_STATE), WantState},
        {m_connection.Atom(AtomName::NET_WM_DESKTOP), WantDesktop},
        {m_connection.Atom(AtomName::NET_WM_WINDOW_TYPE), WantType},
        {m_connection.Atom(AtomName::NET_WM_WINDOW_OPACITY), WantOpacity},
        {m_connection.Atom(AtomName::GTK_FRAME_EXTENTS), WantShadow},
        {m_connection.Atom(AtomName::WM_NAME_UTF8), WantTitle},
        {XCB_ATOM_WM_NAME, WantTitle},
        {XCB_ATOM_WM_CLASS, WantClass},
        {m_connection.Atom(AtomName::NET_WM_STRUT), WantStrut},
        {m_connection.Atom(AtomName::NET_WM_STRUT_PARTIAL), WantStrut},
    };
    const auto* const found = std::find_if(std::begin(meanings), std::end(meanings),
                                           [atom](const auto& each) { return each.first == atom; });
    return found != std::end(meanings) ? found->second : 0U;
}

bool WindowTree::OnProperty(const xcb_property_notify_event_t& event) {
    if (event.window == m_connection.Root()) {
        OnRootProperty(event.atom);
        return false;
    }
    const unsigned what = MeaningOf(event.atom);
    if (what == 0)
        return false;
    Node* node = NodeOf(event.window);
    if (node == nullptr)
        node = NodeOfClient(event.window);
    if (node == nullptr) {
        if (what == WantClient)
            m_wandering.insert(event.window);
        return true;
    }
    // A frame's own properties, but for what a window manager repeats there, say nothing about its client.
    const bool counts = event.window == node->client || what == WantClient ||
                        (what == WantOpacity && event.window == node->window);
    if (!counts)
        return true;
    Want(*node, what);
    if (what == WantClient) {
        NoteStackChange(); // even a window that was never mapped may be listed from now on
        Wake(*node);
    } else if ((what & WantFirst) != 0) {
        NoteChange(*node);
    }
    return true;
}

void WindowTree::OnRootProperty(xcb_atom_t atom) {
    const xcb_atom_t known[] = {m_connection.Atom(AtomName::NET_CURRENT_DESKTOP),
                                m_connection.Atom(AtomName::XROOTPMAP_ID),
                                m_connection.Atom(AtomName::ESETROOT_PMAP_ID)};
    if (atom == XCB_ATOM_NONE || std::find(std::begin(known), std::end(known), atom) == std::end(known))
        return;
    m_rootUnknown = true;
    NoteStackChange();
}

} // namespace platform::x11
