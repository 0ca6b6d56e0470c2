// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"

#include <xcb/xcb.h>

#include <sys/types.h>
#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <utility>
#include <vector>

/// What clients write on their windows, read with suspicion: a property may be of any type, length and value.
/// Nothing here talks to the server, so that all of it can be fed with anything.
namespace platform::x11 {

/// A property as it came. Empty when there is none.
struct Property {
    xcb_atom_t type = 0;
    int format = 0; ///< 8, 16 or 32 bits an item.
    std::vector<std::uint8_t> bytes;

    static Property From(const xcb_get_property_reply_t* reply); ///< Null is a property that isn't there.
    bool IsThere() const { return type != 0; }
    /// Nothing unless it is made of 32-bit items.
    std::vector<std::uint32_t> Words() const;
    std::optional<std::uint32_t> FirstWord() const;
    /// The same of numbers alone, which is what a window says of sizes and of processes.
    std::vector<std::uint32_t> Cardinals() const;
    /// Whether it is a list of atoms that holds this one.
    bool Names(xcb_atom_t atom) const;
};

/// How many 32-bit units of a property are asked for. More than any honest one has, little enough for a
/// hostile one.
inline constexpr std::uint32_t LONGEST_LIST = 1024;
inline constexpr std::uint32_t LONGEST_TEXT = 1024;

/// Mended to UTF-8 and without control characters; Latin-1 unless it is said to be UTF-8.
std::string TitleFrom(const Property& utf8Name, const Property& name, xcb_atom_t utf8String);

/// The pid that a client claims, if it can be one.
std::optional<pid_t> PidFrom(const Property& property);

/// The first local pid in what the server tells of clients: lists of (client, mask, length in bytes, values),
/// of which some may claim to be longer than they are.
std::optional<pid_t> PidFromClientIds(std::span<const std::uint8_t> bytes);

/// The two sources of a window's owner, weighed against each other. A pid that a client writes down counts
/// only in its own machine's tables; the server knows its local clients itself.
struct OwnerClaims {
    std::optional<pid_t> written; ///< _NET_WM_PID
    std::optional<pid_t> known;   ///< By the server.
    bool isOtherMachine = false;  ///< The client names a machine that isn't this one.
};

/// 0 when it can't be told; ourselves when either source says so.
pid_t OwnerFrom(const OwnerClaims& claims, pid_t ourselves);

/// Whether WM_CLIENT_MACHINE names another machine than `host`. None does when it is absent or no text.
bool IsOtherMachine(const Property& machine, const std::string& host);

/// WM_CLASS, its second text, mended.
std::string ClassFrom(const Property& property);

/// 0 to 1; 1 when nothing sensible is said.
float OpacityFrom(const Property& property);

/// What a window is by EWMH, as far as its level depends on it.
enum class WindowType {
    Normal, ///< Also dialogs, utilities, toolbars, splash screens.
    Desktop,
    Dock,
    Menu, ///< Menus, pop-ups, combo boxes, what is dragged.
    Tip,  ///< Tooltips and notifications.
    Unset ///< Nothing known is said.
};

/// What the names of window types are called on a server, in the order in which a client may list them.
using WindowTypeNames = std::span<const std::pair<xcb_atom_t, WindowType>>;

/// The first of the types that a client lists and that is known.
WindowType TypeFrom(const Property& property, WindowTypeNames names);

struct Edges {
    int left = 0;
    int right = 0;
    int top = 0;
    int bottom = 0;

    bool operator==(const Edges&) const = default;
};

/// Left, right, top, bottom, as they are written. All 0 when one of them is negative or beyond `limit`: who
/// writes such a thing means nothing by it.
Edges EdgesFrom(const Property& property, int limit);

/// The space at the edges of the root that a window reserves, each with the stretch along the edge for which
/// it holds (both ends inclusive).
struct Strut {
    Edges size;
    int leftStart = 0, leftEnd = 0;
    int rightStart = 0, rightEnd = 0;
    int topStart = 0, topEnd = 0;
    int bottomStart = 0, bottomEnd = 0;

    bool IsEmpty() const { return size == Edges(); }
    bool operator==(const Strut&) const = default;
};

/// Of the partial one when it is there, else of the other one for the whole of a root that is so large. An
/// edge whose part lies beyond the root, or ends before it begins, reserves nothing.
Strut StrutFrom(const Property& partial, const Property& whole, int rootWidth, int rootHeight);

/// A display's rectangle less what is reserved at its edges; all in pixels of a root of that size. A strut is
/// counted from the root's edge, so one that reaches over the whole of a display is meant for another. Whole
/// when nothing would be left.
CGRect VisibleBounds(const CGRect& display, std::span<const Strut> struts, int rootWidth, int rootHeight);

} // namespace platform::x11
