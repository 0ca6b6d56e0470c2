// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/x11/wallpaper.h"
#include "platform/x11/window_storage.h"
#include "platform/x11/window_storage_fetch.h"
#include "platform/x11/window_storages.h"

#include <xcb/xfixes.h>

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <unordered_map>
#include <vector>

/// What window_storages.cpp and window_storages_take.cpp share.
namespace platform::x11 {

struct WindowStorages::State {
    explicit State(X11Connection& theConnection) : connection(theConnection), pool(theConnection) {}

    struct KnownPixels {
        std::uint8_t depth = 0;
        xcb_visualid_t visual = 0;
        std::optional<ServerPixels> pixels;
    };

    WindowStorage* Find(xcb_window_t window);
    /// Of those that are mapped.
    bool AreAllProven() const;
    /// How its pixels lie and are to be given out; nothing, with one trace, when they can't be.
    std::optional<ServerPixels> PixelsOf(std::uint8_t depth, xcb_visualid_t visual);
    const KnownPixels& KnownPixelsOf(std::uint8_t depth, xcb_visualid_t visual);
    void CountTraffic(std::size_t bytes);
    void OnRearranged(xcb_window_t parent, unsigned sequence);
    /// Has all paintings believed that were told so far; asks the server if there are any.
    void ConfirmPaintings(const std::function<void()>& catchUp);
    FetchTools Tools();
    /// Drops what nobody holds beyond the limit, what was asked for longest ago first.
    void Trim();
    bool IsOverLimit() const;
    std::optional<std::chrono::nanoseconds> NextDue();

    X11Connection& connection;
    SharedPixelsPool pool;
    std::unordered_map<xcb_window_t, std::shared_ptr<WindowStorage>> storages;
    Wallpaper wallpaper;
    xcb_xfixes_region_t parts = 0;
    std::vector<KnownPixels> knownPixels; // of the kinds that windows have had so far
    bool composited = false;
    bool hasTracedPixels = false;
    bool hasTracedSize = false;
    Traffic traffic;
    bool hasFetched = false; // pixels have been fetched, or let go of, for the picture in the making
    std::chrono::nanoseconds lastTrim{0};
    std::chrono::nanoseconds lastPainted = std::chrono::nanoseconds::min();
    // When something is due, as long as nothing has come that could make it earlier. What is asked for again
    // is due later.
    std::optional<std::chrono::nanoseconds> due;
    bool isDueKnown = false;
};

} // namespace platform::x11
