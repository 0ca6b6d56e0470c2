// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"

#include <xcb/randr.h>
#include <xcb/shape.h>
#include <xcb/xcb.h>
#include <xcb/xfixes.h>

#include <string>
#include <vector>

/// What replies of varying length hold. Never more than has come: the counts in a reply are the server's
/// word, and one that lies would have libxcb's own accessors read behind its end. Threads: any. A null reply
/// holds nothing.
namespace platform::x11 {

/// A monitor as the server lists it.
struct ServerMonitor {
    xcb_atom_t name = 0;
    bool primary = false;
    PixelRect bounds;              ///< Cut by the root.
    xcb_randr_output_t output = 0; ///< The first one, 0 for none.
};

/// Those of which something lies in the root; no more than a desk can hold.
std::vector<ServerMonitor> MonitorsFrom(const xcb_randr_get_monitors_reply_t& reply, int rootWidth,
                                        int rootHeight);

/// As the server has it: any bytes.
std::string NameFrom(const xcb_get_atom_name_reply_t* reply);
std::string NameFrom(const xcb_randr_get_output_info_reply_t* reply);
/// Empty for a property that is no row of bytes.
std::string EdidFrom(const xcb_randr_get_output_property_reply_t* reply);

/// From the back to the front.
std::vector<xcb_window_t> ChildrenFrom(const xcb_query_tree_reply_t& reply);
std::vector<xcb_atom_t> AtomsFrom(const xcb_list_properties_reply_t& reply);
std::vector<xcb_rectangle_t> RectanglesFrom(const xcb_shape_get_rectangles_reply_t& reply);
/// From top to bottom.
std::vector<xcb_rectangle_t> RectanglesFrom(const xcb_xfixes_fetch_region_reply_t& reply);

} // namespace platform::x11
