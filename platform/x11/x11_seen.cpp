// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/x11_window_server.h"

#include "platform/x11/reply_bytes.h"
#include "platform/x11/server_replies.h"
#include "platform/x11/x11_connection.h"
#include "platform/x11/x11_failure.h"
#include "util/cm_clock.h"
#include "util/cm_trace.h"

#include <xcb/randr.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <span>
#include <string>
#include <string_view>
#include <vector>

/// Whether the X server that answers shows what people see.
namespace platform {

namespace {

using namespace x11; // NOLINT(google-build-using-namespace): the folder's own

constexpr std::string_view BRIDGE = "XWAYLAND";

bool IsSet(const char* name) {
    const char* const value = std::getenv(name);
    return value != nullptr && *value != '\0';
}

bool IsWaylandSession() {
    const char* const kind = std::getenv("XDG_SESSION_TYPE");
    return IsSet("WAYLAND_DISPLAY") || (kind != nullptr && std::string_view(kind) == "wayland");
}

using Outputs = std::vector<Pending<xcb_randr_get_output_info_reply_t>>;

/// Asks about each of the screen's outputs.
Outputs AskForOutputs(X11Connection& connection) {
    Outputs outputs;
    const auto resources = connection.Fetch<xcb_randr_get_screen_resources_current_reply_t>(
        xcb_randr_get_screen_resources_current(connection.Get(), connection.Root()));
    if (resources == nullptr)
        return outputs;
    const std::span<const std::uint8_t> ids =
        Part(BytesBehind(*resources), resources->num_crtcs * sizeof(xcb_randr_crtc_t),
             resources->num_outputs * sizeof(xcb_randr_output_t));
    for (std::size_t place = 0; place + sizeof(xcb_randr_output_t) <= ids.size();
         place += sizeof(xcb_randr_output_t)) {
        xcb_randr_output_t output = 0;
        std::memcpy(&output, ids.data() + place, sizeof output);
        outputs.push_back(connection.Ask<xcb_randr_get_output_info_reply_t>(
            xcb_randr_get_output_info(connection.Get(), output, XCB_CURRENT_TIME)));
    }
    return outputs;
}

/// Names of the screen's outputs; empty where there is nothing that could tell them.
std::vector<std::string> OutputNames(X11Connection& connection) {
    std::vector<std::string> names;
    if (!connection.Has().randr)
        return names;
    Outputs outputs = AskForOutputs(connection);
    for (Pending<xcb_randr_get_output_info_reply_t>& output : outputs) {
        if (const auto reply = connection.Await(output))
            names.push_back(NameFrom(reply.get()));
    }
    return names;
}

enum class Sight {
    Nothing, ///< No display, or none that answers.
    Bridge,  ///< A Wayland session's, which shows only X programs' windows.
    Desktop,
};

Sight LookAtDisplay() {
    const std::chrono::nanoseconds deadline = CmSteadyNow() + DEFAULT_CONNECT_DEADLINE;
    Link link = ConnectToDisplay({}, deadline, -1);
    if (link.connection == nullptr)
        return Sight::Nothing;
    try {
        X11Connection connection(std::move(link), -1);
        connection.SetDeadline(deadline);
        connection.Introduce();
        const std::vector<std::string> outputs = OutputNames(connection);
        const bool isBridge = !outputs.empty() &&
                              std::all_of(outputs.begin(), outputs.end(),
                                          [](const std::string& name) { return name.rfind(BRIDGE, 0) == 0; });
        return isBridge ? Sight::Bridge : Sight::Desktop;
    } catch (const Lost&) {
        return Sight::Nothing;
    } catch (const Unanswered&) {
        return Sight::Nothing;
    }
}

} // namespace

std::shared_ptr<WindowServer> MakeX11WindowServerIfSeen() {
    if (!IsSet("DISPLAY"))
        return nullptr;
    const Sight sight = IsWaylandSession() ? Sight::Bridge : LookAtDisplay();
    if (sight == Sight::Bridge)
        CmTraceInfo(
            "This is a Wayland session, where an X server shows no more than a few windows: going on "
            "without a window server. SCREENSHARE_PLATFORM=x11 uses it all the same.");
    if (sight != Sight::Desktop)
        return nullptr;
    return std::make_shared<X11WindowServer>();
}

} // namespace platform
