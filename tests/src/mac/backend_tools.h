// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/platform_life.h"
#include "platform/simulated/scene.h"
#include "platform/window_server.h"
#include "src/share_frame.h"
#include "src/share_ref.h"
#include "tests/support/settings_scope.h"

#include <gtest/gtest.h>

#include <array>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <ostream>

/// What tests of back-ends say often.

/// A simulated desktop in force for the length of a scope. It ends once no thread of the platform is at work:
/// a queued capture may outlive its back-end, and reads the clock and the settings of the test.
class CServedScene {
public:
    explicit CServedScene(const platform::Scene& scene)
        : m_server(scene.Serve()),
          m_former(platform::ReplaceWindowServer(m_server)) {}
    ~CServedScene() {
        platform::Rest();
        platform::ReplaceWindowServer(m_former);
    }
    CServedScene(const CServedScene&) = delete;
    CServedScene& operator=(const CServedScene&) = delete;

    platform::SimulatedWindowServer* operator->() const { return m_server.get(); }

private:
    const std::shared_ptr<platform::SimulatedWindowServer> m_server;
    const std::shared_ptr<platform::WindowServer> m_former;
};

/// A colour as 0xRRGGBB, or why there is none.
struct FramePixel {
    static constexpr std::uint32_t NONE = 0xFFFFFFFF;
    std::uint32_t rgb = NONE;

    bool operator==(const FramePixel&) const = default;
};

inline std::ostream& operator<<(std::ostream& out, const FramePixel& pixel) {
    return pixel.rgb == FramePixel::NONE ? out << "no pixel" : out << std::hex << pixel.rgb << std::dec;
}

inline FramePixel PixelAt(IShareFrame& frame, int x, int y) {
    TVLSize size{};
    frame.GetFrameSize(size);
    const SHARE_FRAME_FORMAT format = frame.GetFrameDataFormat();
    if (x < 0 || y < 0 || x >= size.cx || y >= size.cy || frame.GetFrameData() == nullptr ||
        (format != SHARE_FRAME_FORMAT_RGBA && format != SHARE_FRAME_FORMAT_ARGB))
        return {};
    const unsigned char* const at = frame.GetFrameLineData(y) + static_cast<std::ptrdiff_t>(x) * 4 +
                                    (format == SHARE_FRAME_FORMAT_ARGB ? 1 : 0);
    return {static_cast<std::uint32_t>(at[0]) << 16 | static_cast<std::uint32_t>(at[1]) << 8 | at[2]};
}

constexpr FramePixel Rgb(std::uint32_t rgb) {
    return {rgb};
}

inline TVLSize SizeOf(IShareFrame& frame) {
    TVLSize size{};
    frame.GetFrameSize(size);
    return size;
}

/// How many pixels of a frame have that colour.
inline int CountOf(IShareFrame& frame, std::uint32_t rgb) {
    const TVLSize size = SizeOf(frame);
    int count = 0;
    for (int y = 0; y < size.cy; ++y) {
        for (int x = 0; x < size.cx; ++x)
            count += PixelAt(frame, x, y) == Rgb(rgb) ? 1 : 0;
    }
    return count;
}

using FrameRef = ShareRef<IShareFrame>;

inline FrameRef NewFrameRef() {
    return FrameRef(new CShareFrame);
}

/// One small representation of one colour, its hot spot at the top left.
inline platform::SimulatedCursor SquareCursor(std::uint32_t rgb, int size = 4) {
    return {{0, 0}, {{size, size, 1.0F, platform::SimulatedContent::Colour(rgb)}}};
}
