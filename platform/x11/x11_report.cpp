// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/x11_report.h"

#include "platform/utf8.h"
#include "platform/x11/display_address.h"
#include "platform/x11/owned_descriptor.h"
#include "platform/x11/pixel_formats.h"
#include "platform/x11/reply_bytes.h"
#include "platform/x11/window_properties.h"
#include "platform/x11/x11_connection.h"
#include "platform/x11/x11_failure.h"
#include "platform/x11/x11_greeting.h"
#include "platform/x11/x11_patience.h"
#include "util/cm_clock.h"

#include <poll.h>
#include <sys/socket.h>
#include <xcb/composite.h>
#include <xcb/damage.h>
#include <xcb/randr.h>
#include <xcb/res.h>
#include <xcb/shape.h>
#include <xcb/shm.h>
#include <xcb/xfixes.h>
#include <xcb/xinput.h>

#include <algorithm>
#include <cerrno>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <optional>
#include <span>
#include <string_view>
#include <utility>

namespace platform {

namespace {

using namespace x11; // NOLINT(google-build-using-namespace): the folder's own

constexpr std::size_t MOST_MONITORS = 64;
constexpr std::size_t LONGEST_NAME = 200;
constexpr std::string_view BRIDGE_OUTPUT = "XWAYLAND";

std::string Readable(std::string_view text) {
    return WithoutControls(MendedUtf8(text.substr(0, LONGEST_NAME)));
}

// ---- Why there is no connection

/// Whether somebody takes calls there; one whose queue is full does.
bool IsAnswered(const DisplayAddress& address, std::chrono::nanoseconds deadline) {
    const OwnedDescriptor probe(
        socket(address.bytes.ss_family, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
    if (!probe)
        return false;
    if (connect(probe.Get(), reinterpret_cast<const sockaddr*>(&address.bytes), address.size) == 0 ||
        errno == EAGAIN)
        return true;
    if (errno != EINPROGRESS ||
        Patience(deadline, -1).WaitFor(probe.Get(), POLLOUT) != Patience::Outcome::Ready)
        return false;
    int error = 0;
    socklen_t errorSize = sizeof error;
    return getsockopt(probe.Get(), SOL_SOCKET, SO_ERROR, &error, &errorSize) == 0 && error == 0;
}

bool SomebodyListens(const DisplayName& name, std::chrono::nanoseconds deadline) {
    const std::vector<DisplayAddress> addresses = AddressesOf(name);
    return std::any_of(addresses.begin(), addresses.end(),
                       [&](const DisplayAddress& address) { return IsAnswered(address, deadline); });
}

/// Whether the display is there but doesn't have the screen that was asked for.
bool OnlyScreenIsMissing(const DisplayName& name, std::chrono::nanoseconds deadline) {
    if (name.screen == 0)
        return false;
    const std::string firstScreen = name.host + ":" + std::to_string(name.display);
    return ConnectToDisplay(firstScreen, deadline, -1).connection != nullptr;
}

X11Obstacle WhyNoConnection(const DisplayName& name, std::chrono::nanoseconds deadline) {
    if (CmSteadyNow() >= deadline)
        return X11Obstacle::NoAnswer;
    if (OnlyScreenIsMissing(name, deadline))
        return X11Obstacle::NoSuchScreen;
    return SomebodyListens(name, deadline) ? X11Obstacle::Refused : X11Obstacle::NobodyThere;
}

// ---- What a connection tells

X11Extension Found(X11Connection& connection, xcb_extension_t& id, bool suffices) {
    X11Extension found;
    const xcb_query_extension_reply_t* const reply = xcb_get_extension_data(connection.Get(), &id);
    found.present = reply != nullptr && reply->present != 0;
    found.suffices = suffices;
    return found;
}

template <class Reply, class Cookie, class... Version>
void AskVersion(X11Connection& connection, X11Extension& extension,
                Cookie (*ask)(xcb_connection_t*, Version...), Version... ours) {
    if (!extension.present)
        return;
    if (const auto reply = connection.Fetch<Reply>(ask(connection.Get(), ours...))) {
        extension.major = reply->major_version;
        extension.minor = reply->minor_version;
    }
}

void ReadResVersion(X11Connection& connection, X11Extension& xres) {
    if (!xres.present)
        return;
    const auto reply = connection.Fetch<xcb_res_query_version_reply_t>(
        xcb_res_query_version(connection.Get(), XCB_RES_MAJOR_VERSION, XCB_RES_MINOR_VERSION));
    if (reply != nullptr) {
        xres.major = reply->server_major;
        xres.minor = reply->server_minor;
    }
}

void ReadExtensions(X11Connection& connection, X11Report& report) {
    const Extensions& has = connection.Has();
    report.composite = Found(connection, xcb_composite_id, has.composite);
    report.damage = Found(connection, xcb_damage_id, has.damage);
    report.shm = Found(connection, xcb_shm_id, has.shm);
    report.randr = Found(connection, xcb_randr_id, has.randr);
    report.xfixes = Found(connection, xcb_xfixes_id, has.xfixes);
    report.shape = Found(connection, xcb_shape_id, has.shape);
    report.xres = Found(connection, xcb_res_id, has.xres);
    report.xinput = Found(connection, xcb_input_id, has.xinput);
    using Number = std::uint32_t;
    AskVersion<xcb_composite_query_version_reply_t>(connection, report.composite, xcb_composite_query_version,
                                                    Number{XCB_COMPOSITE_MAJOR_VERSION},
                                                    Number{XCB_COMPOSITE_MINOR_VERSION});
    AskVersion<xcb_damage_query_version_reply_t>(connection, report.damage, xcb_damage_query_version,
                                                 Number{XCB_DAMAGE_MAJOR_VERSION},
                                                 Number{XCB_DAMAGE_MINOR_VERSION});
    AskVersion<xcb_shm_query_version_reply_t>(connection, report.shm, xcb_shm_query_version);
    AskVersion<xcb_randr_query_version_reply_t>(connection, report.randr, xcb_randr_query_version,
                                                Number{XCB_RANDR_MAJOR_VERSION},
                                                Number{XCB_RANDR_MINOR_VERSION});
    AskVersion<xcb_xfixes_query_version_reply_t>(connection, report.xfixes, xcb_xfixes_query_version,
                                                 Number{XCB_XFIXES_MAJOR_VERSION},
                                                 Number{XCB_XFIXES_MINOR_VERSION});
    AskVersion<xcb_shape_query_version_reply_t>(connection, report.shape, xcb_shape_query_version);
    ReadResVersion(connection, report.xres);
    AskVersion<xcb_input_xi_query_version_reply_t>(connection, report.xinput, xcb_input_xi_query_version,
                                                   std::uint16_t{2}, std::uint16_t{2});
}

void ReadScreen(X11Connection& connection, X11Report& report) {
    const xcb_setup_t* const setup = xcb_get_setup(connection.Get());
    const xcb_screen_t& screen = connection.Screen();
    report.vendor =
        Readable({xcb_setup_vendor(setup), static_cast<std::size_t>(xcb_setup_vendor_length(setup))});
    report.release = setup->release_number;
    report.width = screen.width_in_pixels;
    report.height = screen.height_in_pixels;
    report.depth = screen.root_depth;
    report.depthReadable = ServerPixelsOf(*setup, screen, screen.root_depth, screen.root_visual).has_value();
}

struct ListedMonitor {
    xcb_randr_monitor_info_t info{};
    Pending<xcb_get_atom_name_reply_t> name;
};

/// Asks for the names of all before it waits for one.
std::vector<ListedMonitor> AskForNames(X11Connection& connection,
                                       const xcb_randr_get_monitors_reply_t& reply) {
    std::vector<ListedMonitor> list;
    std::span<const std::uint8_t> bytes = BytesBehind(reply);
    while (list.size() < MOST_MONITORS && bytes.size() >= sizeof(xcb_randr_monitor_info_t)) {
        ListedMonitor each;
        std::memcpy(&each.info, bytes.data(), sizeof each.info);
        const std::size_t size =
            sizeof each.info + std::size_t{each.info.nOutput} * sizeof(xcb_randr_output_t);
        if (bytes.size() < size)
            break;
        bytes = bytes.subspan(size);
        each.name =
            connection.Ask<xcb_get_atom_name_reply_t>(xcb_get_atom_name(connection.Get(), each.info.name));
        list.push_back(std::move(each));
    }
    return list;
}

void ReadMonitors(X11Connection& connection, X11Report& report) {
    if (!report.randr.suffices)
        return;
    const auto reply = connection.Fetch<xcb_randr_get_monitors_reply_t>(
        xcb_randr_get_monitors(connection.Get(), connection.Root(), 1));
    if (reply == nullptr)
        return;
    std::vector<ListedMonitor> list = AskForNames(connection, *reply);
    for (ListedMonitor& each : list) {
        const auto name = connection.Await(each.name);
        X11Monitor monitor{
            {}, each.info.x, each.info.y, each.info.width, each.info.height, each.info.primary != 0};
        if (name != nullptr)
            monitor.name = Readable(TextOf(Part(BytesBehind(*name), 0, name->name_len)));
        report.monitors.push_back(std::move(monitor));
    }
    report.isWaylandBridge =
        !report.monitors.empty() &&
        std::all_of(report.monitors.begin(), report.monitors.end(),
                    [](const X11Monitor& each) { return each.name.rfind(BRIDGE_OUTPUT, 0) == 0; });
}

Property PropertyOf(X11Connection& connection, xcb_window_t window, xcb_atom_t name) {
    constexpr std::uint32_t LONGEST = LONGEST_NAME / 4;
    return Property::From(connection
                              .Fetch<xcb_get_property_reply_t>(xcb_get_property(
                                  connection.Get(), 0, window, name, XCB_GET_PROPERTY_TYPE_ANY, 0, LONGEST))
                              .get());
}

std::string NameOf(X11Connection& connection, xcb_window_t window) {
    return TitleFrom(PropertyOf(connection, window, connection.Atom(AtomName::WM_NAME_UTF8)),
                     PropertyOf(connection, window, XCB_ATOM_WM_NAME),
                     connection.Atom(AtomName::UTF8_STRING));
}

/// A window manager that was killed leaves its word on the root; only one that lives has a window that says
/// the same of itself.
void ReadWindowManager(X11Connection& connection, X11Report& report) {
    const xcb_atom_t check = connection.Atom(AtomName::NET_SUPPORTING_WM_CHECK);
    const std::optional<std::uint32_t> window = PropertyOf(connection, connection.Root(), check).FirstWord();
    if (!window || PropertyOf(connection, *window, check).FirstWord() != window)
        return;
    report.hasWindowManager = true;
    report.windowManager = NameOf(connection, *window);
}

void ReadCompositor(X11Connection& connection, X11Report& report) {
    const auto reply = connection.Fetch<xcb_get_selection_owner_reply_t>(
        xcb_get_selection_owner(connection.Get(), connection.Atom(AtomName::NET_WM_CM_S0)));
    report.hasCompositor = reply != nullptr && reply->owner != XCB_WINDOW_NONE;
    if (report.hasCompositor)
        report.compositor = NameOf(connection, reply->owner);
}

void Look(Link link, std::chrono::nanoseconds deadline, X11Report& report) {
    try {
        X11Connection connection(std::move(link), -1);
        connection.SetDeadline(deadline);
        connection.Introduce();
        ReadScreen(connection, report);
        ReadExtensions(connection, report);
        ReadMonitors(connection, report);
        ReadWindowManager(connection, report);
        ReadCompositor(connection, report);
    } catch (const Lost&) {
        report.obstacle = X11Obstacle::Lost;
    } catch (const Unanswered&) {
        report.obstacle = X11Obstacle::NoAnswer;
    }
}

} // namespace

X11Report ReportOnX11(const std::string& display, std::chrono::nanoseconds deadline) {
    X11Report report;
    const char* const variable = std::getenv("DISPLAY");
    const std::string asked = !display.empty() || variable == nullptr ? display : variable;
    report.display = Readable(asked);
    if (asked.empty()) {
        report.obstacle = X11Obstacle::NoName;
        return report;
    }
    const std::optional<DisplayName> name = ParseDisplayName(asked);
    if (!name) {
        report.obstacle = X11Obstacle::UnreadableName;
        return report;
    }
    report.overNetwork = name->IsByNetwork();
    if (!report.overNetwork && !name->IsLocal()) {
        report.obstacle = X11Obstacle::AnotherMachine;
        return report;
    }
    report.hasCookie = !CookieOf(name->display).empty();
    Link link = ConnectToDisplay(asked, deadline, -1);
    if (link.connection != nullptr)
        Look(std::move(link), deadline, report);
    else
        report.obstacle = WhyNoConnection(*name, deadline);
    return report;
}

} // namespace platform
