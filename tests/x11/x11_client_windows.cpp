// SPDX-License-Identifier: Apache-2.0
#include "tests/x11/x11_client_windows.h"

#include <unistd.h>
#include <xcb/shape.h>

#include <algorithm>
#include <array>
#include <cstdlib>
#include <utility>

namespace {

constexpr std::uint32_t WINDOW_EVENTS = XCB_EVENT_MASK_EXPOSURE | XCB_EVENT_MASK_STRUCTURE_NOTIFY;

/// The bits of a colour channel, 8 of them, where a visual wants them.
std::uint32_t Channel(std::uint32_t value, std::uint32_t mask) {
    if (mask == 0)
        return 0;
    const int shift = __builtin_ctz(mask);
    const std::uint64_t most = mask >> shift;
    return static_cast<std::uint32_t>((value * most + 127) / 255) << shift;
}

std::uint16_t Extent(int value) {
    return static_cast<std::uint16_t>(value);
}

} // namespace

ClientWindows::ClientWindows(std::string applicationName) : m_applicationName(std::move(applicationName)) {}

ClientWindows::~ClientWindows() {
    if (m_connection != nullptr)
        xcb_disconnect(m_connection);
}

bool ClientWindows::Connect() {
    if (m_connection != nullptr)
        xcb_disconnect(m_connection);
    m_windows.clear();
    m_atoms.clear();
    m_connection = xcb_connect(nullptr, nullptr);
    if (!IsConnected())
        return false;
    m_screen = xcb_setup_roots_iterator(xcb_get_setup(m_connection)).data;
    ClientOptions options;
    options.place = {m_screen->width_in_pixels - 1, m_screen->height_in_pixels - 1, 1, 1};
    return Create("application", options).has_value() && RoundTrip();
}

bool ClientWindows::IsConnected() const {
    return m_connection != nullptr && xcb_connection_has_error(m_connection) == 0;
}

int ClientWindows::Descriptor() const {
    return IsConnected() ? xcb_get_file_descriptor(m_connection) : -1;
}

void ClientWindows::Attend() {
    while (xcb_generic_event_t* const event = xcb_poll_for_event(m_connection)) {
        if (event->response_type == 0) {
            m_refused = true;
        } else if ((event->response_type & 0x7F) == XCB_EXPOSE) {
            Expose(reinterpret_cast<const xcb_expose_event_t*>(event)->window);
        } else if ((event->response_type & 0x7F) == XCB_CONFIGURE_NOTIFY) {
            const auto* const configured = reinterpret_cast<const xcb_configure_notify_event_t*>(event);
            for (auto& each : m_windows) {
                if (each.second.id == configured->window) {
                    each.second.place.width = configured->width;
                    each.second.place.height = configured->height;
                }
            }
        }
        std::free(event);
    }
    PaintDue();
    xcb_flush(m_connection);
}

bool ClientWindows::RoundTrip() {
    if (!IsConnected())
        return false;
    std::free(xcb_get_input_focus_reply(m_connection, xcb_get_input_focus(m_connection), nullptr));
    Attend();
    return IsConnected() && !std::exchange(m_refused, false);
}

// ---- Windows

/// From the upper half of the client's range, one that wasn't used on any server: there are not many ids for
/// windows of one name, and a server that is started again gives the same range again. The library gives out
/// the lower half.
xcb_window_t ClientWindows::NewName() {
    const xcb_setup_t& setup = *xcb_get_setup(m_connection);
    const std::uint32_t half = (setup.resource_id_mask >> 1) + 1;
    return setup.resource_id_base | half | (m_names++ & (half - 1));
}

const xcb_visualtype_t* ClientWindows::VisualOf(int depth) const {
    for (auto each = xcb_screen_allowed_depths_iterator(m_screen); each.rem != 0; xcb_depth_next(&each)) {
        if (each.data->depth != depth)
            continue;
        for (auto visual = xcb_depth_visuals_iterator(each.data); visual.rem != 0;
             xcb_visualtype_next(&visual)) {
            const bool isRoots =
                depth == m_screen->root_depth && visual.data->visual_id != m_screen->root_visual;
            if (visual.data->_class == XCB_VISUAL_CLASS_TRUE_COLOR && !isRoots)
                return visual.data;
        }
    }
    return nullptr;
}

std::uint32_t ClientWindows::PixelOf(std::uint32_t rgb, int depth, int alpha) const {
    const xcb_visualtype_t* const visual = VisualOf(depth);
    if (visual == nullptr)
        return 0;
    const auto channel = [&](int shift, std::uint32_t mask) {
        const std::uint32_t value = rgb >> shift & 0xFF;
        return Channel(depth == 32 ? value * static_cast<std::uint32_t>(alpha) / 255 : value, mask);
    };
    const std::uint32_t colours =
        channel(16, visual->red_mask) | channel(8, visual->green_mask) | channel(0, visual->blue_mask);
    return depth == 32 ? colours | static_cast<std::uint32_t>(alpha) << 24 : colours;
}

xcb_atom_t ClientWindows::Atom(const std::string& name) {
    xcb_atom_t& atom = m_atoms[name];
    if (atom == 0) {
        const auto cookie =
            xcb_intern_atom(m_connection, 0, static_cast<std::uint16_t>(name.size()), name.data());
        if (xcb_intern_atom_reply_t* const reply = xcb_intern_atom_reply(m_connection, cookie, nullptr)) {
            atom = reply->atom;
            std::free(reply);
        }
    }
    return atom;
}

void ClientWindows::SetWords(xcb_window_t window, const std::string& property, const std::string& type,
                             const std::vector<std::uint32_t>& words) {
    xcb_change_property(m_connection, XCB_PROP_MODE_REPLACE, window, Atom(property), Atom(type), 32,
                        static_cast<std::uint32_t>(words.size()), words.data());
}

xcb_window_t ClientWindows::NewWindow(const ClientOptions& options, int depth) {
    const xcb_window_t id = options.id != 0 ? options.id : NewName();
    const auto x = static_cast<std::int16_t>(options.place.x);
    const auto y = static_cast<std::int16_t>(options.place.y);
    const std::uint16_t width = Extent(options.place.width);
    const std::uint16_t height = Extent(options.place.height);
    const xcb_visualid_t visual = VisualOf(depth)->visual_id;
    if (options.inputOnly) {
        const std::uint32_t redirect = options.overrideRedirect ? 1 : 0;
        xcb_create_window(m_connection, 0, id, m_screen->root, x, y, width, height, 0,
                          XCB_WINDOW_CLASS_INPUT_ONLY, 0, XCB_CW_OVERRIDE_REDIRECT, &redirect);
        return id;
    }
    const xcb_colormap_t colours = xcb_generate_id(m_connection);
    xcb_create_colormap(m_connection, XCB_COLORMAP_ALLOC_NONE, colours, m_screen->root, visual);
    const std::uint32_t pixel = PixelOf(options.rgb, depth, options.alpha);
    const std::array<std::uint32_t, 5> values{
        options.noBackground ? static_cast<std::uint32_t>(XCB_BACK_PIXMAP_NONE) : pixel, pixel,
        options.overrideRedirect ? 1U : 0U, WINDOW_EVENTS, colours};
    const std::uint32_t mask = (options.noBackground ? XCB_CW_BACK_PIXMAP : XCB_CW_BACK_PIXEL) |
                               XCB_CW_BORDER_PIXEL | XCB_CW_OVERRIDE_REDIRECT | XCB_CW_EVENT_MASK |
                               XCB_CW_COLORMAP;
    xcb_create_window(m_connection, static_cast<std::uint8_t>(depth), id, m_screen->root, x, y, width, height,
                      Extent(options.border), XCB_WINDOW_CLASS_INPUT_OUTPUT, visual, mask, values.data());
    return id;
}

/// What a window manager reads. Without being asked it would put a title bar around the window and the window
/// somewhere else.
void ClientWindows::Describe(const Window& window, const ClientOptions& options) {
    if (!options.decorated)
        SetWords(window.id, "_MOTIF_WM_HINTS", "_MOTIF_WM_HINTS", {2, 0, 0, 0, 0});
    const std::array<std::uint32_t, 4> place{
        static_cast<std::uint32_t>(options.place.x), static_cast<std::uint32_t>(options.place.y),
        static_cast<std::uint32_t>(options.place.width), static_cast<std::uint32_t>(options.place.height)};
    std::vector<std::uint32_t> hints(18);
    hints[0] = 1U | 2U; // the user wants this position and this size
    std::copy(place.begin(), place.end(), hints.begin() + 1);
    SetWords(window.id, "WM_NORMAL_HINTS", "WM_SIZE_HINTS", hints);
    SetWords(window.id, "_NET_WM_PID", "CARDINAL", {static_cast<std::uint32_t>(getpid())});
    const std::string texts = m_applicationName + '\0' + m_applicationName + '\0';
    xcb_change_property(m_connection, XCB_PROP_MODE_REPLACE, window.id, XCB_ATOM_WM_CLASS, XCB_ATOM_STRING, 8,
                        static_cast<std::uint32_t>(texts.size()), texts.data());
    std::array<char, 256> host{};
    gethostname(host.data(), host.size() - 1);
    const std::string machine = host.data();
    xcb_change_property(m_connection, XCB_PROP_MODE_REPLACE, window.id, XCB_ATOM_WM_CLIENT_MACHINE,
                        XCB_ATOM_STRING, 8, static_cast<std::uint32_t>(machine.size()), machine.data());
    if (!options.type.empty())
        SetWords(window.id, "_NET_WM_WINDOW_TYPE", "ATOM", {Atom("_NET_WM_WINDOW_TYPE_" + options.type)});
    const auto shadow = static_cast<std::uint32_t>(options.extents);
    if (shadow != 0)
        SetWords(window.id, "_GTK_FRAME_EXTENTS", "CARDINAL", {shadow, shadow, shadow, shadow});
    if (options.shaped) {
        const std::array<xcb_rectangle_t, 2> parts{
            {{0, 0, Extent(options.place.width / 2), Extent(options.place.height)},
             {0, 0, Extent(options.place.width), Extent(options.place.height / 2)}}};
        xcb_shape_rectangles(m_connection, XCB_SHAPE_SO_SET, XCB_SHAPE_SK_BOUNDING,
                             XCB_CLIP_ORDERING_UNSORTED, window.id, 0, 0, parts.size(), parts.data());
    }
}

std::optional<xcb_window_t> ClientWindows::Create(const std::string& name, const ClientOptions& options) {
    const int depth = options.depth != 0 ? options.depth : m_screen->root_depth;
    if (!IsConnected() || VisualOf(depth) == nullptr || m_windows.count(name) != 0)
        return std::nullopt;
    Window window;
    window.id = NewWindow(options, depth);
    window.place = options.place;
    window.depth = depth;
    window.pixel = PixelOf(options.rgb, depth, options.alpha);
    window.noBackground = options.noBackground;
    window.idle = options.idle;
    window.slow = std::chrono::milliseconds(options.slowMs);
    if (!options.inputOnly) {
        window.context = xcb_generate_id(m_connection);
        xcb_create_gc(m_connection, window.context, window.id, XCB_GC_FOREGROUND, &window.pixel);
    }
    if (!options.inputOnly && options.mark) {
        const std::uint32_t pixel = PixelOf(*options.mark, depth, options.alpha);
        window.markContext = xcb_generate_id(m_connection);
        xcb_create_gc(m_connection, window.markContext, window.id, XCB_GC_FOREGROUND, &pixel);
    }
    Describe(window, options);
    m_windows[name] = window;
    if (!options.unmapped)
        Map(name);
    return window.id;
}

ClientWindows::Window* ClientWindows::Find(const std::string& name) {
    const auto found = m_windows.find(name);
    return found != m_windows.end() && IsConnected() ? &found->second : nullptr;
}

bool ClientWindows::Destroy(const std::string& name) {
    Window* const window = Find(name);
    if (window == nullptr)
        return false;
    for (const xcb_gcontext_t context : {window->context, window->markContext}) {
        if (context != 0)
            xcb_free_gc(m_connection, context);
    }
    xcb_destroy_window(m_connection, window->id);
    m_windows.erase(name);
    return true;
}

bool ClientWindows::Map(const std::string& name) {
    Window* const window = Find(name);
    if (window != nullptr)
        xcb_map_window(m_connection, window->id);
    return window != nullptr;
}

bool ClientWindows::Unmap(const std::string& name) {
    Window* const window = Find(name);
    if (window != nullptr)
        xcb_unmap_window(m_connection, window->id);
    return window != nullptr;
}

bool ClientWindows::Place(const std::string& name, const ClientPlace& place) {
    Window* const window = Find(name);
    if (window == nullptr)
        return false;
    const std::array<std::uint32_t, 4> values{
        static_cast<std::uint32_t>(place.x), static_cast<std::uint32_t>(place.y),
        static_cast<std::uint32_t>(place.width), static_cast<std::uint32_t>(place.height)};
    xcb_configure_window(
        m_connection, window->id,
        XCB_CONFIG_WINDOW_X | XCB_CONFIG_WINDOW_Y | XCB_CONFIG_WINDOW_WIDTH | XCB_CONFIG_WINDOW_HEIGHT,
        values.data());
    window->place = place;
    return true;
}

bool ClientWindows::Stack(const std::string& name, std::uint32_t mode) {
    Window* const window = Find(name);
    if (window != nullptr)
        xcb_configure_window(m_connection, window->id, XCB_CONFIG_WINDOW_STACK_MODE, &mode);
    return window != nullptr;
}

// ---- Pixels

void ClientWindows::Expose(xcb_window_t exposed) {
    const auto now = std::chrono::steady_clock::now();
    for (auto& each : m_windows) {
        Window& window = each.second;
        if (window.id == exposed && !window.idle && !window.paintsAt)
            window.paintsAt = now + window.slow;
    }
}

void ClientWindows::PaintDue() {
    const auto now = std::chrono::steady_clock::now();
    for (auto& each : m_windows) {
        Window& window = each.second;
        if (!window.paintsAt || *window.paintsAt > now)
            continue;
        Fill(window);
        window.paintsAt.reset();
    }
}

int ClientWindows::MillisecondsToPainting() const {
    const auto now = std::chrono::steady_clock::now();
    int soonest = -1;
    for (const auto& each : m_windows) {
        if (!each.second.paintsAt)
            continue;
        const auto left = std::chrono::ceil<std::chrono::milliseconds>(*each.second.paintsAt - now).count();
        const int until = static_cast<int>(std::max<std::int64_t>(left, 0));
        soonest = soonest < 0 ? until : std::min(soonest, until);
    }
    return soonest;
}

void ClientWindows::Fill(const Window& window) {
    if (window.context == 0)
        return;
    const xcb_rectangle_t all{0, 0, Extent(window.place.width), Extent(window.place.height)};
    xcb_poly_fill_rectangle(m_connection, window.id, window.context, 1, &all);
    if (window.markContext == 0)
        return;
    const xcb_rectangle_t mark{0, 0, Extent(window.place.width / 3), Extent(window.place.height / 4)};
    xcb_poly_fill_rectangle(m_connection, window.id, window.markContext, 1, &mark);
}

bool ClientWindows::Recolour(const std::string& name, std::uint32_t rgb) {
    Window* const window = Find(name);
    if (window == nullptr)
        return false;
    window->pixel = PixelOf(rgb, window->depth);
    if (!window->noBackground)
        xcb_change_window_attributes(m_connection, window->id, XCB_CW_BACK_PIXEL, &window->pixel);
    xcb_change_gc(m_connection, window->context, XCB_GC_FOREGROUND, &window->pixel);
    Fill(*window);
    return true;
}

bool ClientWindows::Paint(const std::string& name) {
    Window* const window = Find(name);
    if (window == nullptr)
        return false;
    window->idle = false;
    Fill(*window);
    return true;
}

// ---- What is asked of window managers

void ClientWindows::TellRoot(xcb_window_t window, const std::string& type,
                             const std::vector<std::uint32_t>& words) {
    xcb_client_message_event_t message{};
    message.response_type = XCB_CLIENT_MESSAGE;
    message.format = 32;
    message.window = window;
    message.type = Atom(type);
    std::copy(words.begin(), words.end(), std::begin(message.data.data32));
    xcb_send_event(m_connection, 0, m_screen->root,
                   XCB_EVENT_MASK_SUBSTRUCTURE_NOTIFY | XCB_EVENT_MASK_SUBSTRUCTURE_REDIRECT,
                   reinterpret_cast<const char*>(&message));
}

bool ClientWindows::Minimise(const std::string& name) {
    Window* const window = Find(name);
    if (window != nullptr)
        TellRoot(window->id, "WM_CHANGE_STATE", {3});
    return window != nullptr;
}

bool ClientWindows::Activate(const std::string& name) {
    Window* const window = Find(name);
    if (window == nullptr)
        return false;
    xcb_map_window(m_connection, window->id);
    TellRoot(window->id, "_NET_ACTIVE_WINDOW", {2, 0, 0});
    return true;
}

bool ClientWindows::KeepAbove(const std::string& name) {
    Window* const window = Find(name);
    if (window != nullptr)
        TellRoot(window->id, "_NET_WM_STATE", {1, Atom("_NET_WM_STATE_ABOVE"), 0, 1});
    return window != nullptr;
}

bool ClientWindows::SetProperty(const std::string& name, const std::string& property, const std::string& type,
                                int format, const std::string& bytes) {
    Window* const window = Find(name);
    if (window == nullptr)
        return false;
    const auto count = static_cast<std::uint32_t>(bytes.size() * 8 / static_cast<unsigned>(format));
    xcb_change_property(m_connection, XCB_PROP_MODE_REPLACE, window->id, Atom(property), Atom(type),
                        static_cast<std::uint8_t>(format), count, bytes.data());
    return true;
}

// ---- What nobody sane does

void ClientWindows::HammerStep(const ClientPlace& around, std::uint32_t rgb, std::uint32_t random) {
    const std::string name = "secret" + std::to_string(random % 6);
    const auto pick = [&random](int range) {
        random = random * 1664525U + 1013904223U;
        return static_cast<int>((random >> 8) % static_cast<unsigned>(range));
    };
    const ClientPlace place{around.x - around.width / 2 + pick(around.width),
                            around.y - around.height / 2 + pick(around.height), 1 + pick(around.width),
                            1 + pick(around.height)};
    if (Find(name) == nullptr) {
        ClientOptions options;
        options.place = place;
        options.rgb = rgb;
        options.overrideRedirect = pick(2) == 0;
        options.noBackground = pick(4) == 0;
        Create(name, options);
        return;
    }
    switch (pick(6)) {
        case 0:
            Destroy(name);
            break;
        case 1:
            Map(name);
            break;
        case 2:
            Unmap(name);
            break;
        case 3:
            Stack(name, pick(2) == 0 ? XCB_STACK_MODE_ABOVE : XCB_STACK_MODE_BELOW);
            break;
        case 4:
            Recolour(name, rgb);
            break;
        default:
            Place(name, place);
    }
}

void ClientWindows::Churn(int count) {
    ClientOptions options;
    options.overrideRedirect = true;
    for (int i = 0; i < count; ++i) {
        options.place = {i % 200, i / 200 % 200, 20, 20};
        Create("churn", options);
        Destroy("churn");
    }
}
