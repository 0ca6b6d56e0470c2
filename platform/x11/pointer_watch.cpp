// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/pointer_watch.h"

#include "platform/x11/reply_bytes.h"
#include "platform/x11/server_event.h"
#include "util/cm_clock.h"

#include <xcb/xfixes.h>
#include <xcb/xinput.h>

#include <algorithm>
#include <cstddef>
#include <cstring>
#include <utility>

namespace platform::x11 {

namespace {

using Bytes = std::vector<std::uint8_t>;

/// Far above what people can still point with.
constexpr int LARGEST_SIDE = 1024;

/// Whatever moves the pointer, whoever has grabbed the device.
constexpr std::uint32_t MOTIONS =
    XCB_INPUT_XI_EVENT_MASK_RAW_MOTION | XCB_INPUT_XI_EVENT_MASK_RAW_BUTTON_PRESS |
    XCB_INPUT_XI_EVENT_MASK_RAW_BUTTON_RELEASE | XCB_INPUT_XI_EVENT_MASK_RAW_TOUCH_BEGIN |
    XCB_INPUT_XI_EVENT_MASK_RAW_TOUCH_UPDATE | XCB_INPUT_XI_EVENT_MASK_RAW_TOUCH_END;

/// The server has words of alpha, red, green and blue. No colour may exceed its alpha, and clients draw
/// cursors that do.
Bytes PremultipliedBgra(std::span<const std::uint8_t> words) {
    Bytes bgra(words.size());
    for (std::size_t i = 0; i + 4 <= words.size(); i += 4) {
        std::uint32_t word = 0;
        std::memcpy(&word, words.data() + i, sizeof word);
        const std::uint32_t alpha = word >> 24;
        bgra[i] = static_cast<std::uint8_t>(std::min(word & 0xFF, alpha));
        bgra[i + 1] = static_cast<std::uint8_t>(std::min(word >> 8 & 0xFF, alpha));
        bgra[i + 2] = static_cast<std::uint8_t>(std::min(word >> 16 & 0xFF, alpha));
        bgra[i + 3] = static_cast<std::uint8_t>(alpha);
    }
    return bgra;
}

std::shared_ptr<CursorImage> CursorFrom(int width, int height, CGPoint hotSpot, Bytes bgra) {
    const auto memory = std::make_shared<const Bytes>(std::move(bgra));
    auto picture = std::make_shared<Picture>();
    picture->width = width;
    picture->height = height;
    picture->stride = static_cast<std::size_t>(width) * 4;
    picture->format = PixelFormat::BGRA;
    picture->pixels = memory->data();
    picture->rect.size = {static_cast<float>(width), static_cast<float>(height)};
    picture->time = CmSteadyNow();
    picture->memory = memory;
    auto cursor = std::make_shared<CursorImage>();
    cursor->hotSpot = hotSpot;
    cursor->representations.push_back(std::move(picture));
    return cursor;
}

} // namespace

std::shared_ptr<CursorImage> CursorFrom(const xcb_xfixes_get_cursor_image_reply_t* reply) {
    if (reply == nullptr || reply->width == 0 || reply->height == 0 || reply->width > LARGEST_SIDE ||
        reply->height > LARGEST_SIDE)
        return nullptr;
    const std::size_t size = std::size_t{reply->width} * reply->height * 4;
    const std::span<const std::uint8_t> words = Part(BytesBehind(*reply), 0, size);
    if (words.size() != size)
        return nullptr;
    const CGPoint hotSpot{static_cast<float>(std::min(reply->xhot, reply->width)),
                          static_cast<float>(std::min(reply->yhot, reply->height))};
    return CursorFrom(reply->width, reply->height, hotSpot, PremultipliedBgra(words));
}

namespace {

bool IsSameCursor(const CursorImage* one, const CursorImage* other) {
    if (one == nullptr || other == nullptr)
        return one == other;
    const Picture& first = *one->representations.front();
    const Picture& second = *other->representations.front();
    return one->hotSpot == other->hotSpot && first.width == second.width && first.height == second.height &&
           std::memcmp(first.pixels, second.pixels, first.stride * static_cast<std::size_t>(first.height)) ==
               0;
}

} // namespace

PointerWatch::PointerWatch(X11Connection& connection, Memory& memory)
    : m_connection(connection),
      m_memory(memory) {}

void PointerWatch::Select() {
    if (m_connection.Has().xfixes) {
        xcb_xfixes_select_cursor_input(m_connection.Get(), m_connection.Root(),
                                       XCB_XFIXES_CURSOR_NOTIFY_MASK_DISPLAY_CURSOR);
    }
}

void PointerWatch::Read() {
    m_changed = true;
    Settle();
}

bool PointerWatch::OnEvent(const xcb_generic_event_t& event) {
    if (IsMotion(event)) {
        if (std::exchange(m_isWatched, false))
            SelectMotion(0);
        return false;
    }
    const std::uint8_t first = m_connection.Has().xfixesEvent;
    if (first == 0 || (event.response_type & 0x7F) != first + XCB_XFIXES_CURSOR_NOTIFY)
        return false;
    m_changed = true;
    return true;
}

bool PointerWatch::Settle() {
    if (!m_changed || !m_connection.Has().xfixes)
        return false;
    const auto reply = m_connection.Fetch<xcb_xfixes_get_cursor_image_reply_t>(
        xcb_xfixes_get_cursor_image(m_connection.Get()));
    m_changed = false;
    std::shared_ptr<CursorImage> cursor = CursorFrom(reply.get());
    if (IsSameCursor(cursor.get(), m_cursor.get()))
        return false;
    if (cursor != nullptr)
        cursor->serial = ++m_memory.lastCursorSerial;
    m_cursor = std::move(cursor);
    return true;
}

std::optional<CGPoint> PointerWatch::Position(BytesAhead ahead) {
    auto question = m_connection.Ask<xcb_query_pointer_reply_t>(
        xcb_query_pointer(m_connection.Get(), m_connection.Root()));
    if (ahead)
        m_connection.LetAnswersGather(*ahead);
    const auto reply = m_connection.Await(question);
    if (reply == nullptr || reply->same_screen == 0)
        return std::nullopt;
    return CGPoint{static_cast<float>(reply->root_x), static_cast<float>(reply->root_y)};
}

// ---- Motion

std::optional<CGPoint> PointerWatch::WatchedPosition(BytesAhead ahead) {
    // What is told between the two requests is looked at later, and taken for news.
    if (!m_isWatched && m_connection.Has().xinput) {
        SelectMotion(MOTIONS);
        m_isWatched = true;
    }
    m_position.reset();
    m_position = Position(ahead);
    return m_position;
}

void PointerWatch::SelectMotion(std::uint32_t kinds) {
    const struct {
        xcb_input_event_mask_t head;
        std::uint32_t kinds;
    } mask{{XCB_INPUT_DEVICE_ALL_MASTER, 1}, kinds};
    xcb_input_xi_select_events(m_connection.Get(), m_connection.Root(), 1, &mask.head);
}

/// We ask for no other kinds.
bool PointerWatch::IsMotion(const xcb_generic_event_t& event) const {
    if (event.response_type != XCB_GE_GENERIC || !m_connection.Has().xinput)
        return false;
    return As<xcb_ge_generic_event_t>(event).extension == m_connection.Has().xinputOpcode;
}

} // namespace platform::x11
