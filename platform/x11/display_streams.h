// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"
#include "platform/x11/shared_pixels.h"
#include "platform/x11/x11_connection.h"

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>

namespace platform::x11 {

/// A reader of a display. The stream and the X thread share it; it outlives connections.
/// Threads: `id`, `request`, `epoch` never change; the rest is the X thread's.
struct StreamReader {
    std::uint64_t id = 0;
    DisplayStreamRequest request;
    std::uint64_t epoch = 0;
    struct Place; ///< What the streams of this connection know of it.
    std::shared_ptr<Place> place;
    bool told = false;
    bool gone = false;
    std::optional<std::chrono::nanoseconds> took;
};
using StreamReaderPtr = std::shared_ptr<StreamReader>;

/// What a picture of a display is made with: told by the session at each Take.
struct StreamMoment {
    const DisplayList* displays = nullptr;
    CGPoint origin;                     ///< Of the main display, in the root.
    std::uint64_t generationBefore = 0; ///< See Picture: the oldest stack that the screen may still show.
    std::uint64_t generation = 0;       ///< Of the stack in force.
    std::function<std::uint64_t()> generationAfter; ///< The same later; takes in every event that is here.
    std::optional<CGPoint> pointer;                 ///< In the root, for readers who want it drawn.
    std::shared_ptr<const CursorImage> cursor;
};

/// Pictures of displays as they are seen: the root's pixels, fetched where they were damaged.
/// Threads: the X thread.
/// Errors:  those of X11Connection.
class DisplayStreams {
public:
    explicit DisplayStreams(X11Connection& connection);
    ~DisplayStreams();
    DisplayStreams(const DisplayStreams&) = delete;
    DisplayStreams& operator=(const DisplayStreams&) = delete;

    void Attach(const StreamReaderPtr& reader);
    void Detach(const StreamReaderPtr& reader);
    /// The layout has changed: readers whose display is gone are gone, others begin anew.
    void OnDisplaysChanged(const DisplayList& displays);
    /// The pointer has moved or has another image.
    void OnPointerChanged();

    bool OnEvent(const xcb_generic_event_t& event);
    /// Readers that have something new by now and haven't been told.
    std::optional<std::chrono::nanoseconds> NextDue() const;
    void DoDue(const std::function<void(std::uint64_t stream)>& tell);

    DisplayPictureResult Take(StreamReader& reader, const StreamMoment& moment);
    void Drop(std::chrono::nanoseconds before); ///< Memory that has lain idle.

private:
    struct State;
    const std::unique_ptr<State> m_state;
};

} // namespace platform::x11
