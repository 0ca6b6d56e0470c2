// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/display_mirror.h"

#include "platform/utf8.h"
#include "platform/x11/server_replies.h"
#include "util/cm_clock.h"

#include <algorithm>
#include <cstddef>
#include <set>
#include <tuple>
#include <utility>

namespace platform::x11 {

namespace {

/// In units of 4 bytes: 256 blocks, which is as many as an EDID can count.
constexpr std::uint32_t LONGEST_EDID = 256 * 128 / 4;

CGRect RectOf(const PixelRect& rect) {
    return {{static_cast<float>(rect.left), static_cast<float>(rect.top)},
            {static_cast<float>(rect.right - rect.left), static_cast<float>(rect.bottom - rect.top)}};
}

CGRect Moved(const CGRect& rect, const CGPoint& origin) {
    return {{rect.origin.x - origin.x, rect.origin.y - origin.y}, rect.size};
}

/// What has to be asked about a monitor.
struct Questions {
    Questions(X11Connection& connection, const ServerMonitor& monitor)
        : name(connection.Ask<xcb_get_atom_name_reply_t>(xcb_get_atom_name(connection.Get(), monitor.name))) {
        if (monitor.output == 0)
            return;
        output = connection.Ask<xcb_randr_get_output_info_reply_t>(
            xcb_randr_get_output_info(connection.Get(), monitor.output, XCB_CURRENT_TIME));
        edid = connection.Ask<xcb_randr_get_output_property_reply_t>(
            xcb_randr_get_output_property(connection.Get(), monitor.output, connection.Atom(AtomName::EDID),
                                          XCB_GET_PROPERTY_TYPE_ANY, 0, LONGEST_EDID, 0, 0));
        hasOutput = true;
    }

    Pending<xcb_get_atom_name_reply_t> name;
    Pending<xcb_randr_get_output_info_reply_t> output{};
    Pending<xcb_randr_get_output_property_reply_t> edid{};
    bool hasOutput = false;
};

/// Names of a monitor, for people and for its id.
struct Names {
    Names(X11Connection& connection, Questions& questions)
        : monitor(NameFrom(connection.Await(questions.name).get())) {
        if (!questions.hasOutput)
            return;
        connector = NameFrom(connection.Await(questions.output).get());
        edid = EdidFrom(connection.Await(questions.edid).get());
    }

    std::string monitor;
    std::string connector;
    std::string edid;
};

std::string ProductNameOf(const Names& names) {
    const auto* const bytes = reinterpret_cast<const std::uint8_t*>(names.edid.data());
    for (const std::string& name :
         {ProductNameFromEdid({bytes, names.edid.size()}), names.connector, names.monitor}) {
        if (std::string mended = WithoutControls(MendedUtf8(name)); !mended.empty())
            return mended;
    }
    return "Display";
}

bool IsSameDisplay(const DisplayInfo& one, const DisplayInfo& other) {
    return one.id == other.id && one.bounds == other.bounds && one.visibleBounds == other.visibleBounds &&
           one.scale == other.scale && one.productName == other.productName;
}

} // namespace

struct DisplayMirror::Monitor {
    DisplayInfo info; // bounds in pixels of the root
    bool primary = false;
};

DisplayMirror::DisplayMirror(X11Connection& connection, Memory& memory)
    : m_connection(connection),
      m_memory(memory),
      m_displays(std::make_shared<const DisplayList>()) {}

void DisplayMirror::Select() {
    if (m_connection.Has().randr) {
        xcb_randr_select_input(m_connection.Get(), m_connection.Root(),
                               XCB_RANDR_NOTIFY_MASK_SCREEN_CHANGE | XCB_RANDR_NOTIFY_MASK_CRTC_CHANGE |
                                   XCB_RANDR_NOTIFY_MASK_OUTPUT_CHANGE);
    }
    // A client has one mask for each window, and others of ours watch the root, too.
    const auto attributes = m_connection.Fetch<xcb_get_window_attributes_reply_t>(
        xcb_get_window_attributes(m_connection.Get(), m_connection.Root()));
    std::uint32_t mask = attributes != nullptr ? attributes->your_event_mask : 0;
    mask |= XCB_EVENT_MASK_STRUCTURE_NOTIFY;
    xcb_change_window_attributes(m_connection.Get(), m_connection.Root(), XCB_CW_EVENT_MASK, &mask);
}

void DisplayMirror::Read() {
    Pending<xcb_get_geometry_reply_t> geometry =
        m_connection.Ask<xcb_get_geometry_reply_t>(xcb_get_geometry(m_connection.Get(), m_connection.Root()));
    Pending<xcb_randr_get_monitors_reply_t> asked;
    if (m_connection.Has().randr) {
        asked = m_connection.Ask<xcb_randr_get_monitors_reply_t>(
            xcb_randr_get_monitors(m_connection.Get(), m_connection.Root(), 1));
    }
    ReadRoot(geometry);
    Malloced<xcb_randr_get_monitors_reply_t> reply;
    if (m_connection.Has().randr)
        reply = m_connection.Await(asked);

    std::vector<Monitor> monitors;
    if (reply != nullptr)
        monitors = ReadMonitors(*reply);
    else
        monitors.push_back(WholeRoot());

    std::sort(monitors.begin(), monitors.end(), [](const Monitor& one, const Monitor& other) {
        const auto place = [](const Monitor& each) {
            const CGPoint& corner = each.info.bounds.origin;
            return std::make_tuple(!each.primary, corner.x, corner.y, each.info.id);
        };
        return place(one) < place(other);
    });
    m_monitors.clear();
    for (const Monitor& each : monitors) {
        const bool mirrors =
            std::any_of(m_monitors.begin(), m_monitors.end(),
                        [&each](const DisplayInfo& former) { return former.bounds == each.info.bounds; });
        if (!mirrors)
            m_monitors.push_back(each.info);
    }
    Publish();
}

void DisplayMirror::ReadRoot(Pending<xcb_get_geometry_reply_t>& geometry) {
    const auto reply = m_connection.Await(geometry);
    const xcb_screen_t& atFirst = m_connection.Screen();
    // NOLINTBEGIN(clang-analyzer-core.NullDereference): no connection is without its screen
    m_rootWidth = reply != nullptr ? reply->width : atFirst.width_in_pixels;
    m_rootHeight = reply != nullptr ? reply->height : atFirst.height_in_pixels;
    // NOLINTEND(clang-analyzer-core.NullDereference)
}

std::vector<DisplayMirror::Monitor> DisplayMirror::ReadMonitors(const xcb_randr_get_monitors_reply_t& reply) {
    const std::vector<ServerMonitor> list = MonitorsFrom(reply, m_rootWidth, m_rootHeight);
    std::vector<Questions> questions;
    questions.reserve(list.size());
    for (const ServerMonitor& each : list)
        questions.emplace_back(m_connection, each);

    std::vector<Monitor> monitors;
    std::set<CGDirectDisplayID> ids;
    for (std::size_t i = 0; i < list.size(); ++i) {
        const Names names(m_connection, questions[i]);
        Monitor monitor;
        monitor.primary = list[i].primary;
        monitor.info.bounds = RectOf(list[i].bounds);
        monitor.info.productName = ProductNameOf(names);
        std::string connector = !names.connector.empty() ? names.connector : names.monitor;
        monitor.info.id = m_memory.displayIds.IdOf(connector, names.edid);
        // One output can be said to be in two monitors.
        while (!ids.insert(monitor.info.id).second) {
            connector += '\n' + names.monitor;
            monitor.info.id = m_memory.displayIds.IdOf(connector, names.edid);
        }
        monitors.push_back(std::move(monitor));
    }
    return monitors;
}

DisplayMirror::Monitor DisplayMirror::WholeRoot() {
    Monitor monitor;
    monitor.info.id = m_memory.displayIds.IdOf("screen " + std::to_string(m_connection.ScreenNumber()), {});
    monitor.info.bounds = RectOf({0, 0, m_rootWidth, m_rootHeight});
    monitor.info.productName = "Display";
    return monitor;
}

void DisplayMirror::Publish() {
    m_origin = m_monitors.empty() ? CGPoint() : m_monitors.front().bounds.origin;
    DisplayList displays = m_monitors;
    for (DisplayInfo& display : displays) {
        const CGRect visible = VisibleBounds(display.bounds, m_struts, m_rootWidth, m_rootHeight);
        display.visibleBounds = Moved(visible, m_origin);
        display.bounds = Moved(display.bounds, m_origin);
    }
    if (!std::equal(displays.begin(), displays.end(), m_displays->begin(), m_displays->end(), IsSameDisplay))
        m_displays = std::make_shared<const DisplayList>(std::move(displays));
}

bool DisplayMirror::OnEvent(const xcb_generic_event_t& event) {
    const int type = event.response_type & 0x7F;
    bool concerns = false;
    if (type == XCB_CONFIGURE_NOTIFY) {
        concerns = reinterpret_cast<const xcb_configure_notify_event_t&>(event).window == m_connection.Root();
    } else if (m_connection.Has().randrEvent != 0) {
        const int kind = type - m_connection.Has().randrEvent;
        concerns = kind == XCB_RANDR_SCREEN_CHANGE_NOTIFY || kind == XCB_RANDR_NOTIFY;
    }
    if (!concerns)
        return false;
    const std::chrono::nanoseconds now = CmSteadyNow();
    if (!m_firstEvent)
        m_firstEvent = now;
    m_due = std::min(now + SETTLE_TIME, *m_firstEvent + LONGEST_SETTLE_TIME);
    return true;
}

bool DisplayMirror::DoDue() {
    const std::chrono::nanoseconds now = CmSteadyNow();
    if (!m_due || now < *m_due)
        return false;
    const auto before = std::make_tuple(m_displays, m_origin.x, m_origin.y, m_rootWidth, m_rootHeight);
    m_due = now + SETTLE_TIME; // for the case that the server doesn't answer now
    Read();
    m_due.reset();
    m_firstEvent.reset();
    return before != std::make_tuple(m_displays, m_origin.x, m_origin.y, m_rootWidth, m_rootHeight);
}

bool DisplayMirror::SetStruts(std::span<const Strut> struts) {
    m_struts.assign(struts.begin(), struts.end());
    const std::shared_ptr<const DisplayList> before = m_displays;
    Publish();
    return m_displays != before;
}

} // namespace platform::x11
