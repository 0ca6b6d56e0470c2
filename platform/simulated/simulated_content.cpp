// SPDX-License-Identifier: Apache-2.0
#include "platform/simulated/simulated_content.h"

#include <algorithm>
#include <utility>

namespace platform {

SimulatedContent::SimulatedContent(Body body) : m_body(std::make_shared<const Body>(std::move(body))) {}

SimulatedContent SimulatedContent::Colour(std::uint32_t rgb) {
    return Painted([colour = Opaque(rgb)](int, int) { return colour; });
}

SimulatedContent SimulatedContent::Painted(Paint paint) {
    return SimulatedContent(
        Body{[paint = std::move(paint)](int x, int y, std::uint64_t) { return paint(x, y); }, {}});
}

SimulatedContent SimulatedContent::Moving(std::chrono::nanoseconds step, MovingPaint paint) {
    return SimulatedContent(Body{std::move(paint), std::max(step, std::chrono::nanoseconds(1))});
}

SimulatedContent SimulatedContent::Pixels(int width, int height, std::vector<SimulatedArgb> rows) {
    rows.resize(static_cast<std::size_t>(std::max(width, 0)) * static_cast<std::size_t>(std::max(height, 0)));
    return Painted([width, height, rows = std::move(rows)](int x, int y) {
        if (x >= width || y >= height)
            return SimulatedArgb{0};
        return rows[static_cast<std::size_t>(y) * static_cast<std::size_t>(width) +
                    static_cast<std::size_t>(x)];
    });
}

std::uint64_t SimulatedContent::FrameAt(std::chrono::nanoseconds elapsed) const {
    if (m_body == nullptr || m_body->step.count() == 0 || elapsed.count() <= 0)
        return 0;
    return static_cast<std::uint64_t>(elapsed / m_body->step);
}

std::optional<std::chrono::nanoseconds> SimulatedContent::NextFrameAfter(
    std::chrono::nanoseconds elapsed) const {
    if (m_body == nullptr || m_body->step.count() == 0)
        return std::nullopt;
    return m_body->step * static_cast<std::int64_t>(FrameAt(elapsed) + 1);
}

SimulatedArgb SimulatedContent::At(int x, int y, std::uint64_t frame) const {
    return m_body != nullptr ? m_body->paint(x, y, frame) : SimulatedArgb{0};
}

} // namespace platform
