// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"
#include "platform/x11/window_properties.h"
#include "platform/x11/x11_connection.h"
#include "platform/x11/x11_memory.h"

#include <xcb/xcb.h>

#include <sys/types.h>
#include <cstdint>
#include <list>
#include <memory>
#include <optional>
#include <string>
#include <unordered_map>
#include <unordered_set>
#include <utility>
#include <vector>

namespace platform::x11 {

/// A child of the root: a window's frame, or a window that no window manager has framed. Its storage holds
/// what is seen of it and of everything inside it.
struct TopLevel {
    xcb_window_t window = 0; ///< The child of the root.
    xcb_window_t client = 0; ///< Who carries the properties: a window inside the frame, or `window` itself.
    CGWindowID id = 0;       ///< 0 until it is listed for the first time, or when its ids are used up.

    // Pixels of the root; the size is without the border.
    int x = 0;
    int y = 0;
    int width = 0;
    int height = 0;
    int border = 0;
    std::uint8_t depth = 0; ///< 0, as are the next two, until it has been asked.
    xcb_visualid_t visual = 0;
    bool inputOnly = false;
    bool mapped = false;
    bool overrideRedirect = false;
    bool known = false; ///< Everything below has been found out, or can't be.
    /// A window manager has it in its care, also while it is unmapped.
    bool managed = false;
    /// The client that was in it, or on its way in, is gone. What it painted is still to be seen there and
    /// would pass for the frame's, so it isn't listed until it has another client. Nothing else ends that:
    /// answers overtake events, so one that is mapped or resized later by the events may have been so before.
    bool bereft = false;

    pid_t owner = 0;
    std::string title;
    std::string windowClass; ///< WM_CLASS, its second text.
    WindowType type = WindowType::Unset;
    bool hidden = false; ///< Minimised, by what the window manager says.
    bool above = false;
    bool onThisDesktop = true;
    float opacity = 1.0F;
    Strut strut;
    Edges shadow; ///< _GTK_FRAME_EXTENTS: how much of its edges a client says is shadow.
    bool shaped = false;
    /// Of the bounding shape, in pixels of the storage, beyond which they may reach. Empty unless `shaped`;
    /// then too when nothing is to be seen, or when there are too many.
    std::vector<PixelRect> shape;
    PixelRect shapeBounds;

    /// Size of the storage: with the border.
    int StorageWidth() const { return width + 2 * border; }
    int StorageHeight() const { return height + 2 * border; }
    /// The part of the storage that is listed as its frame: less the shadow, within the shape's bounds.
    PixelRect VisiblePart() const;
    /// The same in points of the desktop; `origin` is where the main display's corner is in the root.
    CGRect Frame(const CGPoint& origin) const;
    bool OnScreen() const { return mapped && !hidden && onThisDesktop && !inputOnly; }
    bool IsListed() const { return known && id != 0 && !inputOnly && !bereft && (mapped || managed); }
};

/// Hears of what happens to windows' storage, at once and before anything else is read from the server. It
/// doesn't call the tree's operations that change it.
class TopLevelWatcher {
public:
    virtual ~TopLevelWatcher() = default;
    /// It exists from now on, perhaps mapped already. At the start, for each that is there. A window that
    /// comes later may have neither size nor depth yet.
    virtual void OnAdded(const TopLevel& window) = 0;
    /// It was mapped, or has another size or border: what its storage holds is not its own any more until it
    /// has painted. `sequence` is that of the event.
    virtual void OnStorageRenewed(const TopLevel& window, unsigned sequence) = 0;
    virtual void OnUnmapped(const TopLevel& window) = 0;
    virtual void OnGone(const TopLevel& window) = 0;
};

/// The windows of a screen, kept true by events, so that listing them asks nobody.
///
/// The generation grows as soon as an event tells of a change; the snapshot of it is made when everything
/// about every mapped window is known, so that no window passes for a window of nobody meanwhile.
/// Threads: the X thread.
/// Errors:  those of X11Connection. What it then has not learned it learns at the next Settle.
class WindowTree {
public:
    WindowTree(X11Connection& connection, Memory& memory, TopLevelWatcher& watcher);
    ~WindowTree();
    WindowTree(const WindowTree&) = delete;
    WindowTree& operator=(const WindowTree&) = delete;

    /// Asks for the events. Before the server is grabbed for Begin.
    void Select();
    /// Reads the whole tree. Under a ServerGrab; the events from before are void, and are known as such.
    void Begin();

    /// Takes an event in; false for one that doesn't concern it, or may concern others too.
    bool OnEvent(const xcb_generic_event_t& event);
    /// Finds out what events have left unknown: a round trip if there is anything.
    void Settle();

    /// Where the layout puts the origin, what it reserves for levels; and whether a compositor is there,
    /// without which nothing is translucent. Each change is a change of the stack.
    void SetDisplays(const DisplayList& displays, const CGPoint& origin);
    void SetComposited(bool composited);

    /// Of everything that events have told so far.
    std::uint64_t Generation() const { return m_memory.generation; }
    /// Everything is known, so that Snapshot is of Generation().
    bool IsSettled() const;
    /// Something may be seen on the screen that no snapshot of Generation() lists: a frame that has lost its
    /// client, a window for which there was no id, or one that isn't known yet.
    bool ShowsUnlisted() const;
    /// The newest that could be made; the same object while nothing has changed. Never null.
    std::shared_ptr<const WindowSnapshot> Snapshot();

    /// The one that is listed under it. Null for a window that is not there any more. Good until the next
    /// event.
    const TopLevel* FindById(CGWindowID id) const;
    const TopLevel* FindByWindow(xcb_window_t window) const; ///< A child of the root.
    /// All of them, from the front to the back, listed or not.
    std::vector<const TopLevel*> FrontFirst() const;
    /// Reserved edges of all mapped windows.
    std::vector<Strut> Struts() const;
    /// Grows when a window, its owner, its struts or its title have changed: whoever derives something else
    /// looks whether he has to.
    std::uint64_t Revision() const { return m_revision; }

    /// The root's own picture, if it has one: the wallpaper. It is listed as the rearmost window under the
    /// root's name.
    xcb_pixmap_t Wallpaper() const { return m_wallpaper; }

private:
    struct Node;  // a TopLevel with what is still to be asked about it
    class Reader; // asks and takes in, see window_tree_reader.h
    using Nodes = std::list<Node>;
    using Place = Nodes::iterator;

    Node* NodeOf(xcb_window_t window);
    Node* NodeOfClient(xcb_window_t client);
    bool IsAnythingUnknown() const;
    void ForgetIdsOfMissing();
    std::shared_ptr<const WindowSnapshot> MakeSnapshot() const;

    bool IsOfServer(xcb_window_t window) const;
    Node& Add(xcb_window_t window); ///< In front of all.
    void Remove(xcb_window_t window);
    void RemoveAll();
    void MoveAbove(Place node, xcb_window_t sibling);
    void Want(Node& node, unsigned what);
    void Wake(Node& node);
    void NoteChange(const Node& node);
    void NoteStackChange();

    void Adopt(Node& frame, xcb_window_t client);
    void Detach(xcb_window_t client);
    void SetClient(Node& node, xcb_window_t client);
    void PlaceOnDesktop(Node& node) const;
    void Follow(xcb_window_t window, xcb_window_t parent);

    bool IsVoid(unsigned sequence);
    void OnCreate(const xcb_create_notify_event_t& event);
    void OnDestroy(const xcb_destroy_notify_event_t& event);
    void OnMap(const xcb_map_notify_event_t& event, unsigned sequence);
    void OnShownInside(Node& frame, xcb_window_t window);
    void OnUnmap(const xcb_unmap_notify_event_t& event);
    void OnReparent(const xcb_reparent_notify_event_t& event);
    void OnConfigure(const xcb_configure_notify_event_t& event, unsigned sequence);
    void OnRootResized(int width, int height);
    void OnGravity(const xcb_gravity_notify_event_t& event);
    void OnCirculate(const xcb_circulate_notify_event_t& event);
    bool OnProperty(const xcb_property_notify_event_t& event);
    void OnRootProperty(xcb_atom_t atom);
    void OnShape(const xcb_generic_event_t& event);
    void Reshape(Node& node, int width, int height, int border, unsigned sequence);
    unsigned MeaningOf(xcb_atom_t atom) const;

    X11Connection& m_connection;
    Memory& m_memory;
    TopLevelWatcher& m_watcher;
    const std::string m_host;
    const pid_t m_ourselves;
    const std::vector<std::pair<xcb_atom_t, WindowType>> m_types;
    Nodes m_backFirst;
    std::unordered_map<xcb_window_t, Place> m_byWindow;
    std::unordered_map<xcb_window_t, xcb_window_t> m_frameOfClient; // also of those that may become one
    std::unordered_set<xcb_window_t> m_toAsk;                       // children of the root
    std::unordered_set<xcb_window_t> m_wandering; // windows that went somewhere below a child of the root
    std::optional<unsigned> m_voidBefore;         // events before this request
    bool m_begun = false;
    bool m_wasTold = false;   // the watcher knows the windows
    bool m_recalling = false; // ids of an earlier connection may belong to windows that are gone
    bool m_rootUnknown = true;
    xcb_pixmap_t m_wallpaper = 0;
    std::optional<std::uint32_t> m_desktop;
    int m_rootWidth = 0;
    int m_rootHeight = 0;
    DisplayList m_displays;
    CGPoint m_origin;
    bool m_composited = false;
    std::uint64_t m_revision = 1;
    std::uint64_t m_snapshotRevision = 0;
    std::shared_ptr<const WindowSnapshot> m_snapshot;
};

} // namespace platform::x11
