// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <vector>

namespace platform {

/// 0xAARRGGBB, not premultiplied.
using SimulatedArgb = std::uint32_t;

constexpr SimulatedArgb Opaque(std::uint32_t rgb) {
    return 0xFF000000U | rgb;
}

/// What a window, a display's background or a cursor shows. Immutable; copies share it.
///
/// Coordinates are pixels from the top left. Functions are called under the server's lock, on any thread:
/// they must answer alike each time, call no server and move no clock. One that throws fails the operation
/// that needed its pixels.
class SimulatedContent {
public:
    using Paint = std::function<SimulatedArgb(int x, int y)>;
    using MovingPaint = std::function<SimulatedArgb(int x, int y, std::uint64_t frame)>;

    /// Not painted yet: nothing to show.
    SimulatedContent() = default;

    /// Opaque, 0xRRGGBB.
    static SimulatedContent Colour(std::uint32_t rgb);
    static SimulatedContent Painted(Paint paint);
    /// Frame 0 from the making of the server, the next one each `step` (above 0).
    static SimulatedContent Moving(std::chrono::nanoseconds step, MovingPaint paint);
    /// Rows without gaps from the top left corner; whatever is larger is transparent beside and below them.
    static SimulatedContent Pixels(int width, int height, std::vector<SimulatedArgb> rows);

    bool IsPainted() const { return m_body != nullptr; }
    /// Which of its frames it shows so long after the beginning; always 0 for what doesn't move.
    std::uint64_t FrameAt(std::chrono::nanoseconds elapsed) const;
    /// When the frame after the one of that time begins; nothing for what doesn't move.
    std::optional<std::chrono::nanoseconds> NextFrameAfter(std::chrono::nanoseconds elapsed) const;
    SimulatedArgb At(int x, int y, std::uint64_t frame) const;

    /// The same content, not only an equal one.
    bool operator==(const SimulatedContent&) const = default;

private:
    struct Body {
        MovingPaint paint;
        std::chrono::nanoseconds step{0}; // 0 for what doesn't move
    };

    explicit SimulatedContent(Body body);

    std::shared_ptr<const Body> m_body;
};

} // namespace platform
