// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/window_storages.h"

#include "platform/x11/server_event.h"
#include "platform/x11/server_replies.h"
#include "platform/x11/window_storages_state.h"
#include "util/cm_clock.h"
#include "util/cm_trace.h"

#include <xcb/composite.h>
#include <xcb/damage.h>
#include <xcb/shape.h>

#include <algorithm>
#include <cstddef>
#include <utility>
#include <vector>

/// Hearing of windows and keeping their pictures. How pictures are taken is in window_storages_take.cpp.
namespace platform::x11 {

namespace {

using Nanoseconds = std::chrono::nanoseconds;

/// How long more than the limit may be kept after a picture.
constexpr Nanoseconds TRIM_TIME = std::chrono::seconds(1);
/// Idle memory is kept a little longer than what it held.
constexpr Nanoseconds IDLE_TIME = std::chrono::seconds(5);

/// Of pixels that are remembered; a screen has a handful.
constexpr std::size_t MOST_KINDS = 64;

/// The window whose children have been rearranged in a way that makes others visible, or moves pixels; 0 when
/// that isn't told.
xcb_window_t RearrangedIn(const xcb_generic_event_t& event, const X11Connection& connection) {
    const std::uint8_t shapeEvent = connection.Has().shapeEvent;
    if (shapeEvent != 0 && event.response_type == shapeEvent)
        return connection.Root();
    switch (event.response_type) {
        case XCB_CONFIGURE_NOTIFY:
            return As<xcb_configure_notify_event_t>(event).event;
        case XCB_GRAVITY_NOTIFY:
            return As<xcb_gravity_notify_event_t>(event).event;
        case XCB_CIRCULATE_NOTIFY:
            return As<xcb_circulate_notify_event_t>(event).event;
        case XCB_UNMAP_NOTIFY:
            return As<xcb_unmap_notify_event_t>(event).event;
        case XCB_REPARENT_NOTIFY:
            return As<xcb_reparent_notify_event_t>(event).event;
        case XCB_DESTROY_NOTIFY:
            return As<xcb_destroy_notify_event_t>(event).event;
        default:
            return 0;
    }
}

// A child of the root, as it is found before storages are kept.
struct FoundWindow {
    xcb_window_t window = 0;
    Pending<xcb_get_window_attributes_reply_t> attributes;
    Pending<xcb_get_geometry_reply_t> geometry;
    Pending<xcb_shape_get_rectangles_reply_t> shape;
};

struct MappedWindow {
    xcb_window_t window = 0;
    PixelRect place; // of the storage, in the root
    int border = 0;
    PixelRegion shape; // in the root
};

FoundWindow AskAbout(X11Connection& connection, xcb_window_t window) {
    xcb_connection_t* const xcb = connection.Get();
    FoundWindow found;
    found.window = window;
    found.attributes =
        connection.Ask<xcb_get_window_attributes_reply_t>(xcb_get_window_attributes(xcb, window));
    found.geometry = connection.Ask<xcb_get_geometry_reply_t>(xcb_get_geometry(xcb, window));
    if (connection.Has().shape) {
        found.shape = connection.Ask<xcb_shape_get_rectangles_reply_t>(
            xcb_shape_get_rectangles(xcb, window, XCB_SHAPE_SK_BOUNDING));
    }
    return found;
}

/// Nothing for a window that can't be seen.
std::optional<MappedWindow> Answered(X11Connection& connection, FoundWindow& found) {
    const auto attributes = connection.Await(found.attributes);
    const auto geometry = connection.Await(found.geometry);
    const auto shape =
        connection.Has().shape ? connection.Await(found.shape) : Malloced<xcb_shape_get_rectangles_reply_t>();
    if (attributes == nullptr || geometry == nullptr || attributes->map_state != XCB_MAP_STATE_VIEWABLE ||
        attributes->_class == XCB_WINDOW_CLASS_INPUT_ONLY)
        return std::nullopt;
    const int border = geometry->border_width;
    const PixelRect place{geometry->x, geometry->y, geometry->x + geometry->width + 2 * border,
                          geometry->y + geometry->height + 2 * border};
    MappedWindow mapped{found.window, place, border, PixelRegion()};
    if (shape == nullptr) {
        mapped.shape.Add(place);
        return mapped;
    }
    for (const xcb_rectangle_t& each : RectanglesFrom(*shape)) {
        const int left = place.left + border + each.x;
        const int top = place.top + border + each.y;
        mapped.shape.Add(PixelRect{left, top, left + each.width, top + each.height});
    }
    mapped.shape.Intersect(place);
    return mapped;
}

/// From the back to the front.
std::vector<MappedWindow> ReadMapped(X11Connection& connection) {
    std::vector<FoundWindow> found;
    const auto tree =
        connection.Fetch<xcb_query_tree_reply_t>(xcb_query_tree(connection.Get(), connection.Root()));
    if (tree == nullptr)
        return {};
    for (const xcb_window_t child : ChildrenFrom(*tree))
        found.push_back(AskAbout(connection, child));
    std::vector<MappedWindow> mapped;
    for (FoundWindow& each : found) {
        if (std::optional<MappedWindow> answered = Answered(connection, each))
            mapped.push_back(*std::move(answered));
    }
    return mapped;
}

} // namespace

// ---- State

WindowStorage* WindowStorages::State::Find(xcb_window_t window) {
    const auto found = storages.find(window);
    return found != storages.end() ? found->second.get() : nullptr;
}

const WindowStorages::State::KnownPixels& WindowStorages::State::KnownPixelsOf(std::uint8_t depth,
                                                                               xcb_visualid_t visual) {
    const auto found = std::find_if(knownPixels.begin(), knownPixels.end(), [&](const KnownPixels& each) {
        return each.depth == depth && each.visual == visual;
    });
    if (found != knownPixels.end())
        return *found;
    if (knownPixels.size() == MOST_KINDS)
        knownPixels.clear();
    knownPixels.push_back(
        {depth, visual, ServerPixelsOf(connection.Setup(), connection.Screen(), depth, visual)});
    return knownPixels.back();
}

std::optional<ServerPixels> WindowStorages::State::PixelsOf(std::uint8_t depth, xcb_visualid_t visual) {
    std::optional<ServerPixels> pixels = KnownPixelsOf(depth, visual).pixels;
    if (!pixels) {
        if (!std::exchange(hasTracedPixels, true))
            CmTraceWarning("[WindowStorages]>>pixels of a kind that can't be read, depth ", int{depth});
    } else if (!composited) {
        pixels->format = WithoutAlpha(pixels->format);
    }
    return pixels;
}

void WindowStorages::State::CountTraffic(std::size_t bytes) {
    if (bytes == 0)
        return;
    hasFetched = true;
    ++traffic.fetches;
    traffic.bytes += bytes;
}

FetchTools WindowStorages::State::Tools() {
    if (parts == 0) {
        parts = connection.NewId();
        xcb_xfixes_create_region(connection.Get(), parts, 0, nullptr);
    }
    return {connection, pool, parts};
}

bool WindowStorages::State::IsOverLimit() const {
    std::size_t kept = wallpaper.KeptBytes();
    for (const auto& [window, storage] : storages)
        kept += storage->KeptBytes();
    return kept > CACHE_LIMIT;
}

void WindowStorages::State::Trim() {
    lastTrim = CmSteadyNow();
    if (!IsOverLimit()) // with what others hold
        return;
    std::vector<WindowStorage*> unheld;
    std::size_t kept = wallpaper.KeptBytes();
    for (const auto& [window, storage] : storages) {
        const std::size_t bytes = storage->KeptBytes();
        if (bytes == 0 || storage->IsHeldByOthers())
            continue;
        kept += bytes;
        unheld.push_back(storage.get());
    }
    if (kept <= CACHE_LIMIT)
        return;
    std::sort(unheld.begin(), unheld.end(),
              [](const WindowStorage* a, const WindowStorage* b) { return a->Asked() < b->Asked(); });
    for (WindowStorage* storage : unheld) {
        if (kept <= CACHE_LIMIT)
            return;
        kept -= storage->KeptBytes();
        storage->Drop();
        hasFetched = true;
    }
}

// ---- WindowStorages

WindowStorages::WindowStorages(X11Connection& connection) : m_state(std::make_unique<State>(connection)) {}

WindowStorages::~WindowStorages() = default;

void WindowStorages::Redirect(bool composited) {
    X11Connection& connection = m_state->connection;
    m_state->composited = composited;
    m_state->isDueKnown = false;
    if (!connection.Has().composite)
        return;
    const Nanoseconds now = CmSteadyNow();
    const PixelRect root{0, 0, connection.Screen().width_in_pixels, connection.Screen().height_in_pixels};
    PixelRegion above;
    std::vector<MappedWindow> mapped = ReadMapped(connection);
    for (auto window = mapped.rbegin(); window != mapped.rend(); ++window) {
        PixelRegion seen = window->shape;
        seen.Intersect(root);
        seen.Subtract(above);
        PixelRegion covered(window->place);
        covered.Subtract(seen);
        covered.Translate(-window->place.left, -window->place.top);
        const auto storage = std::make_shared<WindowStorage>(connection, window->window);
        storage->TrustMapped(window->place.right - window->place.left,
                             window->place.bottom - window->place.top, window->border,
                             composited ? PixelRegion() : covered, now);
        m_state->storages[window->window] = storage;
        above.Add(window->shape);
    }
    // The watches are there by now: they hear of backgrounds that this has painted.
    xcb_composite_redirect_subwindows(connection.Get(), connection.Root(), XCB_COMPOSITE_REDIRECT_AUTOMATIC);
}

void WindowStorages::SetComposited(bool composited) {
    if (composited == std::exchange(m_state->composited, composited))
        return;
    // Who is visible changes with it for all, and no event tells so.
    m_state->OnRearranged(m_state->connection.Root(), xcb_no_operation(m_state->connection.Get()).sequence);
}

void WindowStorages::OnAdded(const TopLevel& window) {
    m_state->isDueKnown = false;
    if (window.inputOnly || (window.mapped && m_state->Find(window.window) != nullptr))
        return;
    auto& storage = m_state->storages[window.window];
    storage = std::make_shared<WindowStorage>(m_state->connection, window.window);
    storage->OnAdded(window, CmSteadyNow());
}

void WindowStorages::OnStorageRenewed(const TopLevel& window, unsigned sequence) {
    m_state->isDueKnown = false;
    if (WindowStorage* const storage = m_state->Find(window.window))
        storage->OnRenewed(window, sequence, CmSteadyNow());
}

void WindowStorages::OnUnmapped(const TopLevel& window) {
    m_state->isDueKnown = false;
    if (WindowStorage* const storage = m_state->Find(window.window))
        storage->OnUnmapped();
}

void WindowStorages::OnGone(const TopLevel& window) {
    m_state->isDueKnown = false;
    const auto found = m_state->storages.find(window.window);
    if (found == m_state->storages.end())
        return;
    // A fetch that is on its way may still share it.
    found->second->OnGone();
    m_state->storages.erase(found);
}

bool WindowStorages::OnEvent(const xcb_generic_event_t& event) {
    if (IsSentByClient(event))
        return false;
    State& state = *m_state;
    if (const xcb_window_t told = RearrangedIn(event, state.connection))
        state.OnRearranged(told, event.full_sequence);
    const std::uint8_t first = state.connection.Has().damageEvent;
    if (first == 0 || event.response_type != first + XCB_DAMAGE_NOTIFY)
        return false;
    const auto& damage = As<xcb_damage_notify_event_t>(event);
    WindowStorage* const storage = state.Find(damage.drawable);
    if (storage == nullptr)
        return false;
    state.isDueKnown = false;
    return storage->OnDamage(damage, event.full_sequence);
}

/// Children of `parent` were rearranged.
void WindowStorages::State::OnRearranged(xcb_window_t parent, unsigned sequence) {
    bool isNumberToEnd = false;
    if (parent != connection.Root()) {
        WindowStorage* const storage = Find(parent);
        isNumberToEnd = storage != nullptr && storage->OnRearrangedInside(sequence);
    } else {
        for (const auto& [window, storage] : storages)
            isNumberToEnd = storage->OnRearranged(sequence) || isNumberToEnd;
    }
    if (!isNumberToEnd)
        return;
    isDueKnown = false;
    xcb_no_operation(connection.Get());
    connection.Flush();
}

void WindowStorages::State::ConfirmPaintings(const std::function<void()>& catchUp) {
    const bool isAnything = std::any_of(storages.begin(), storages.end(), [](const auto& each) {
        return each.second->Proof().IsAnythingUnconfirmed();
    });
    if (!isAnything)
        return;
    const unsigned here = xcb_no_operation(connection.Get()).sequence;
    connection.RoundTrip();
    catchUp();
    for (const auto& [window, storage] : storages)
        storage->Confirm(here);
    lastPainted = CmSteadyNow();
}

std::optional<Nanoseconds> WindowStorages::State::NextDue() {
    std::optional<Nanoseconds> next = wallpaper.NextDue();
    const auto consider = [&next](const std::optional<Nanoseconds>& other) {
        if (other && (!next || *other < *next))
            next = other;
    };
    for (const auto& [window, storage] : storages)
        consider(storage->NextDue());
    if (IsOverLimit())
        consider(lastTrim + TRIM_TIME);
    return next;
}

std::optional<std::chrono::nanoseconds> WindowStorages::NextDue() const {
    State& state = *m_state;
    if (!std::exchange(state.isDueKnown, true))
        state.due = state.NextDue();
    // Memory comes back from other threads without a word.
    std::optional<Nanoseconds> next = state.pool.OldestIdle();
    if (next)
        *next += IDLE_TIME;
    return state.due && (!next || *state.due < *next) ? state.due : next;
}

bool WindowStorages::DoDue() {
    State& state = *m_state;
    const Nanoseconds now = CmSteadyNow();
    const std::optional<Nanoseconds> due = NextDue();
    if (!due || *due > now)
        return false;
    state.isDueKnown = false;
    for (const auto& [window, storage] : state.storages)
        storage->DoDue(now);
    state.wallpaper.DoDue(now);
    state.Trim();
    state.pool.Drop(now - IDLE_TIME);
    state.connection.Flush();
    return true;
}

WindowStorages::Traffic WindowStorages::TrafficSoFar() const {
    return m_state->traffic;
}

} // namespace platform::x11
