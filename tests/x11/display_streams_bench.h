// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/pixel_region.h"
#include "platform/x11/display_mirror.h"
#include "platform/x11/display_streams.h"
#include "platform/x11/pointer_watch.h"
#include "tests/x11/component_bench.h"

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <iostream>
#include <memory>
#include <optional>
#include <vector>

namespace platform::x11 {

/// Streams with what they are told by, as in a session. Small: every pixel can be looked at.
class StreamBench : public ComponentBench {
public:
    explicit StreamBench(const XServerOptions& options)
        : ComponentBench(options),
          mirror(connection, memory),
          pointer(connection, memory),
          streams(connection) {
        mirror.Select();
        mirror.Read();
        pointer.Select();
        pointer.Read();
        MovePointer(options.width - 1, options.height - 1);
    }

    StreamReaderPtr Open(bool withPointer = false, unsigned framesPerSecond = 1'000'000'000) {
        const auto reader = std::make_shared<StreamReader>();
        reader->id = ++m_lastId;
        reader->request = {mirror.Displays()->at(0).id, framesPerSecond, withPointer};
        streams.Attach(reader);
        return reader;
    }

    DisplayPictureResult Take(const StreamReaderPtr& reader) {
        CatchUp();
        return TakeAsOfNow(reader);
    }

    /// What nobody has heard of yet is not known.
    DisplayPictureResult TakeAsOfNow(const StreamReaderPtr& reader) {
        StreamMoment moment;
        const std::shared_ptr<const DisplayList> displays = mirror.Displays();
        moment.displays = displays.get();
        moment.origin = mirror.Origin();
        moment.generationBefore = oldest.value_or(memory.generation);
        moment.generation = memory.generation;
        moment.generationAfter = [this] {
            ++asksForGeneration;
            return memory.generation;
        };
        if (reader->request.withPointer)
            moment.pointer = pointer.Position();
        pointer.Settle();
        moment.cursor = cursor != nullptr ? cursor : pointer.Cursor();
        return streams.Take(*reader, moment);
    }

    /// As a session does: what others have asked the server for is done, and we know.
    void CatchUp() {
        Drain([this](const xcb_generic_event_t& event) {
            streams.OnEvent(event);
            if (pointer.OnEvent(event))
                streams.OnPointerChanged();
            mirror.OnEvent(event);
        });
    }

    std::vector<std::uint64_t> TellWhatIsDue() {
        CatchUp();
        std::vector<std::uint64_t> told;
        streams.DoDue([&](std::uint64_t stream) { told.push_back(stream); });
        return told;
    }

    /// The screen as another client sees it, as 0xFFRRGGBB; of a server of depth 24.
    std::vector<std::uint32_t> Screen() {
        const int width = server.Options().width;
        const int height = server.Options().height;
        const Malloced<xcb_get_image_reply_t> reply(xcb_get_image_reply(
            link.Get(),
            xcb_get_image(link.Get(), XCB_IMAGE_FORMAT_Z_PIXMAP, link.Root(), 0, 0,
                          static_cast<std::uint16_t>(width), static_cast<std::uint16_t>(height), ~0U),
            nullptr));
        std::vector<std::uint32_t> pixels(static_cast<std::size_t>(width * height));
        std::memcpy(pixels.data(), xcb_get_image_data(reply.get()), pixels.size() * 4);
        for (std::uint32_t& pixel : pixels)
            pixel |= 0xFF000000;
        return pixels;
    }

    DisplayMirror mirror;
    PointerWatch pointer;
    DisplayStreams streams;
    int asksForGeneration = 0;
    std::optional<std::uint64_t> oldest;       ///< The stack that may still be seen; without it that of now.
    std::shared_ptr<const CursorImage> cursor; ///< Instead of the pointer's.

private:
    std::uint64_t m_lastId = 0;
};

inline bool LacksServer() {
    const auto missing = MissingProgram(XServer::ProgramsOf(XServerOptions::Kind::Xvfb));
    if (missing)
        std::cout << *missing << "\n";
    return missing.has_value();
}

inline PixelRegion RegionOf(const std::vector<PixelRect>& rects) {
    PixelRegion region;
    for (const PixelRect& rect : rects)
        region.Add(rect);
    return region;
}

} // namespace platform::x11
