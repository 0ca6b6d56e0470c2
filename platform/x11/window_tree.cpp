// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/window_tree.h"

#include "platform/x11/window_levels.h"
#include "platform/x11/window_tree_node.h"
#include "platform/x11/window_tree_reader.h"
#include "platform/x11/x11_greeting.h"

#include <unistd.h>

#include <algorithm>
#include <cstddef>
#include <iterator>
#include <unordered_set>

/// The windows and what is made of them. What events change is in window_tree_events.cpp.
namespace platform::x11 {

namespace {

/// A window that changes faster than it can be asked about is not waited for without end.
constexpr int MOST_PASSES = 4;
constexpr std::uint32_t ALL_DESKTOPS = 0xFFFFFFFF;

std::vector<std::pair<xcb_atom_t, WindowType>> TypesOf(const X11Connection& connection) {
    constexpr std::pair<AtomName, WindowType> TYPES[] = {
        {AtomName::TYPE_DESKTOP, WindowType::Desktop},  {AtomName::TYPE_DOCK, WindowType::Dock},
        {AtomName::TYPE_TOOLBAR, WindowType::Normal},   {AtomName::TYPE_MENU, WindowType::Menu},
        {AtomName::TYPE_UTILITY, WindowType::Normal},   {AtomName::TYPE_SPLASH, WindowType::Normal},
        {AtomName::TYPE_DIALOG, WindowType::Normal},    {AtomName::TYPE_DROPDOWN_MENU, WindowType::Menu},
        {AtomName::TYPE_POPUP_MENU, WindowType::Menu},  {AtomName::TYPE_TOOLTIP, WindowType::Tip},
        {AtomName::TYPE_NOTIFICATION, WindowType::Tip}, {AtomName::TYPE_COMBO, WindowType::Menu},
        {AtomName::TYPE_DND, WindowType::Menu},         {AtomName::TYPE_NORMAL, WindowType::Normal},
    };
    std::vector<std::pair<xcb_atom_t, WindowType>> types;
    for (const auto& type : TYPES)
        types.emplace_back(connection.Atom(type.first), type.second);
    return types;
}

PixelRect Common(const PixelRect& one, const PixelRect& other) {
    const PixelRect common{std::max(one.left, other.left), std::max(one.top, other.top),
                           std::min(one.right, other.right), std::min(one.bottom, other.bottom)};
    const bool isEmpty = common.left >= common.right || common.top >= common.bottom;
    return isEmpty ? PixelRect() : common;
}

bool IsSame(const DisplayList& one, const DisplayList& other) {
    return std::equal(one.begin(), one.end(), other.begin(), other.end(),
                      [](const DisplayInfo& a, const DisplayInfo& b) {
                          return a.id == b.id && a.bounds == b.bounds && a.visibleBounds == b.visibleBounds;
                      });
}

} // namespace

PixelRect TopLevel::VisiblePart() const {
    PixelRect part{0, 0, StorageWidth(), StorageHeight()};
    const PixelRect inner{shadow.left, shadow.top, part.right - shadow.right, part.bottom - shadow.bottom};
    if (inner.left < inner.right && inner.top < inner.bottom)
        part = inner;
    return shaped ? Common(part, shapeBounds) : part;
}

CGRect TopLevel::Frame(const CGPoint& origin) const {
    const PixelRect part = VisiblePart();
    return {{static_cast<float>(x + part.left) - origin.x, static_cast<float>(y + part.top) - origin.y},
            {static_cast<float>(part.right - part.left), static_cast<float>(part.bottom - part.top)}};
}

WindowTree::WindowTree(X11Connection& connection, Memory& memory, TopLevelWatcher& watcher)
    : m_connection(connection),
      m_memory(memory),
      m_watcher(watcher),
      m_host(HostName()),
      m_ourselves(getpid()),
      m_types(TypesOf(connection)),
      m_rootWidth(connection.Screen().width_in_pixels),
      m_rootHeight(connection.Screen().height_in_pixels),
      m_snapshot(std::make_shared<const WindowSnapshot>()) {}

WindowTree::~WindowTree() = default;

// ---- Reading

void WindowTree::Select() {
    constexpr std::uint32_t MASK =
        XCB_EVENT_MASK_SUBSTRUCTURE_NOTIFY | XCB_EVENT_MASK_STRUCTURE_NOTIFY | XCB_EVENT_MASK_PROPERTY_CHANGE;
    xcb_change_window_attributes(m_connection.Get(), m_connection.Root(), XCB_CW_EVENT_MASK, &MASK);
}

void WindowTree::Begin() {
    m_begun = false;
    RemoveAll();
    m_rootUnknown = true;
    NoteStackChange();
    Reader reader(*this);
    reader.RecognizeServer();
    m_voidBefore = reader.ReadList();
    reader.ReadBasics();
    m_wasTold = true;
    for (const Node& node : m_backFirst)
        m_watcher.OnAdded(node);
    m_begun = true;
    m_recalling = true;
    Settle();
}

void WindowTree::Settle() {
    if (!m_begun) {
        const ServerGrab grab(m_connection);
        Begin();
        return;
    }
    Reader reader(*this);
    for (int pass = 0; pass < MOST_PASSES && IsAnythingUnknown(); ++pass) {
        if (m_rootUnknown)
            reader.ReadRoot();
        reader.FollowWanderers();
        reader.ReadWindows();
    }
    if (m_recalling && IsSettled())
        ForgetIdsOfMissing();
}

bool WindowTree::IsAnythingUnknown() const {
    return m_rootUnknown || !m_wandering.empty() || !m_toAsk.empty();
}

bool WindowTree::IsSettled() const {
    if (!m_begun || m_rootUnknown || !m_wandering.empty())
        return false;
    return std::none_of(m_toAsk.begin(), m_toAsk.end(),
                        [this](xcb_window_t window) { return !m_byWindow.at(window)->known; });
}

bool WindowTree::ShowsUnlisted() const {
    return !IsSettled() || std::any_of(m_backFirst.begin(), m_backFirst.end(), [](const Node& node) {
        return node.mapped && !node.inputOnly && !node.IsListed();
    });
}

/// After a connection anew to the same server: what isn't there any more, or belongs to another process now,
/// went while nobody looked.
void WindowTree::ForgetIdsOfMissing() {
    m_memory.windowIds.ReleaseIf([this](std::uint32_t name) {
        const Node* node = NodeOf(name);
        if (node == nullptr)
            node = NodeOfClient(name);
        return node == nullptr || (node->client == name && node->id == 0);
    });
    m_recalling = false;
}

void WindowTree::SetDisplays(const DisplayList& displays, const CGPoint& origin) {
    if (IsSame(displays, m_displays) && origin == m_origin)
        return;
    m_displays = displays;
    m_origin = origin;
    NoteStackChange();
}

void WindowTree::SetComposited(bool composited) {
    if (composited == m_composited)
        return;
    m_composited = composited;
    NoteStackChange();
}

// ---- Answering

std::shared_ptr<const WindowSnapshot> WindowTree::Snapshot() {
    if (m_snapshotRevision != m_revision && IsSettled()) {
        m_snapshot = MakeSnapshot();
        m_snapshotRevision = m_revision;
    }
    return m_snapshot;
}

std::shared_ptr<const WindowSnapshot> WindowTree::MakeSnapshot() const {
    std::vector<WindowInfo> windows;
    std::vector<LevelInput> inputs;
    std::unordered_set<CGWindowID> listed;
    windows.reserve(m_backFirst.size() + 1);
    inputs.reserve(m_backFirst.size() + 1);
    for (auto node = m_backFirst.rbegin(); node != m_backFirst.rend(); ++node) {
        // A client on its way into its frame may be found in both places for a moment.
        if (!node->IsListed() || !listed.insert(node->id).second)
            continue;
        WindowInfo info;
        info.id = node->id;
        info.owner = node->owner;
        info.alpha = m_composited ? node->opacity : 1.0F;
        info.frame = node->Frame(m_origin);
        info.onScreen = node->OnScreen();
        info.title = node->title;
        inputs.push_back({node->type, node->overrideRedirect && !node->managed, node->above, false,
                          info.onScreen, info.frame});
        windows.push_back(std::move(info));
    }
    if (m_wallpaper != 0) {
        WindowInfo root;
        root.id = m_connection.Root();
        root.frame = {{-m_origin.x, -m_origin.y},
                      {static_cast<float>(m_rootWidth), static_cast<float>(m_rootHeight)}};
        inputs.push_back({WindowType::Desktop, false, false, true, true, root.frame});
        windows.push_back(std::move(root));
    }
    const std::vector<int> levels = LevelsOf(inputs, m_displays);
    for (std::size_t place = 0; place < windows.size(); ++place)
        windows[place].level = levels[place];
    return std::make_shared<const WindowSnapshot>(m_memory.generation, std::move(windows));
}

const TopLevel* WindowTree::FindById(CGWindowID id) const {
    const auto node = std::find_if(m_backFirst.rbegin(), m_backFirst.rend(),
                                   [id](const Node& each) { return each.id == id; });
    return id != 0 && node != m_backFirst.rend() ? &*node : nullptr;
}

const TopLevel* WindowTree::FindByWindow(xcb_window_t window) const {
    const auto found = m_byWindow.find(window);
    return found != m_byWindow.end() ? &*found->second : nullptr;
}

std::vector<const TopLevel*> WindowTree::FrontFirst() const {
    std::vector<const TopLevel*> windows;
    windows.reserve(m_backFirst.size());
    for (auto node = m_backFirst.rbegin(); node != m_backFirst.rend(); ++node)
        windows.push_back(&*node);
    return windows;
}

std::vector<Strut> WindowTree::Struts() const {
    std::vector<Strut> struts;
    for (const Node& node : m_backFirst) {
        if (node.mapped && !node.strut.IsEmpty())
            struts.push_back(node.strut);
    }
    return struts;
}

// ---- Upkeep

WindowTree::Node* WindowTree::NodeOf(xcb_window_t window) {
    const auto found = m_byWindow.find(window);
    return found != m_byWindow.end() ? &*found->second : nullptr;
}

WindowTree::Node* WindowTree::NodeOfClient(xcb_window_t client) {
    const auto frame = m_frameOfClient.find(client);
    return frame != m_frameOfClient.end() ? NodeOf(frame->second) : nullptr;
}

/// No client has made it. It is the overlay that a compositor draws the whole screen on, who is kept out and
/// all, or what covers the screen when nobody works: neither is a window of anybody's, and there is nothing
/// else of that kind.
bool WindowTree::IsOfServer(xcb_window_t window) const {
    return (window & ~m_connection.Setup().resource_id_mask) == 0;
}

WindowTree::Node& WindowTree::Add(xcb_window_t window) {
    Node& node = m_backFirst.emplace_back();
    node.window = window;
    node.client = window;
    m_byWindow[window] = std::prev(m_backFirst.end());
    constexpr std::uint32_t MASK = XCB_EVENT_MASK_PROPERTY_CHANGE;
    xcb_change_window_attributes(m_connection.Get(), window, XCB_CW_EVENT_MASK, &MASK);
    return node;
}

void WindowTree::Remove(xcb_window_t window) {
    const auto found = m_byWindow.find(window);
    if (found == m_byWindow.end())
        return;
    Node& node = *found->second;
    NoteChange(node);
    m_watcher.OnGone(node);
    // They may live on where it has gone to.
    for (const xcb_window_t client : node.inside) {
        m_frameOfClient.erase(client);
        m_wandering.insert(client);
    }
    m_toAsk.erase(window);
    m_backFirst.erase(found->second);
    m_byWindow.erase(found);
}

void WindowTree::RemoveAll() {
    for (const Node& node : m_backFirst) {
        if (m_wasTold)
            m_watcher.OnGone(node);
    }
    m_wasTold = false;
    m_backFirst.clear();
    m_byWindow.clear();
    m_frameOfClient.clear();
    m_toAsk.clear();
    m_wandering.clear();
}

void WindowTree::MoveAbove(Place node, xcb_window_t sibling) {
    Place place = m_backFirst.begin();
    if (sibling != XCB_WINDOW_NONE) {
        const auto below = m_byWindow.find(sibling);
        if (below == m_byWindow.end()) {
            m_begun = false; // the order is lost: read anew
            return;
        }
        place = std::next(below->second);
    }
    m_backFirst.splice(place, m_backFirst, node);
}

void WindowTree::Want(Node& node, unsigned what) {
    node.wants |= what;
    if (node.asleep)
        return;
    node.known = node.known && (what & WantFirst) == 0;
    m_toAsk.insert(node.window);
}

void WindowTree::Wake(Node& node) {
    node.asleep = false;
    node.known = node.known && node.id != 0;
    if (node.wants != 0 || !node.known)
        Want(node, node.wants);
}

void WindowTree::NoteChange(const Node& node) {
    ++m_revision;
    if ((node.mapped || node.managed) && !node.inputOnly)
        ++m_memory.generation;
}

void WindowTree::NoteStackChange() {
    ++m_revision;
    ++m_memory.generation;
}

void WindowTree::PlaceOnDesktop(Node& node) const {
    node.onThisDesktop =
        !node.desktop || !m_desktop || *node.desktop == ALL_DESKTOPS || *node.desktop == *m_desktop;
}

/// The node has another one to tell about it.
void WindowTree::SetClient(Node& node, xcb_window_t client) {
    if (node.client == client)
        return;
    node.client = client;
    node.bereft = node.bereft && client == node.window;
    node.id = 0;
    NoteChange(node);
    Want(node, WantProperties);
}

void WindowTree::Adopt(Node& frame, xcb_window_t client) {
    m_wandering.erase(client);
    if (!frame.inside.insert(client).second)
        return;
    m_frameOfClient[client] = frame.window;
    constexpr std::uint32_t OF_CLIENT = XCB_EVENT_MASK_PROPERTY_CHANGE | XCB_EVENT_MASK_STRUCTURE_NOTIFY;
    constexpr std::uint32_t OF_FRAME = XCB_EVENT_MASK_PROPERTY_CHANGE | XCB_EVENT_MASK_SUBSTRUCTURE_NOTIFY;
    xcb_connection_t* const connection = m_connection.Get();
    xcb_change_window_attributes(connection, client, XCB_CW_EVENT_MASK, &OF_CLIENT);
    xcb_change_window_attributes(connection, frame.window, XCB_CW_EVENT_MASK, &OF_FRAME);
    NoteStackChange();
    Want(frame, WantClient);
    Wake(frame);
}

/// It isn't below that frame any more.
void WindowTree::Detach(xcb_window_t client) {
    m_wandering.erase(client);
    Node* const frame = NodeOfClient(client);
    m_frameOfClient.erase(client);
    if (frame == nullptr)
        return;
    frame->inside.erase(client);
    if (frame->client != client && frame->client != frame->window)
        return;
    frame->bereft = true;
    NoteChange(*frame);
    SetClient(*frame, frame->window);
    Want(*frame, WantClient);
}

} // namespace platform::x11
