// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/root_damage.h"

#include "platform/x11/reply_bytes.h"

#include <xcb/damage.h>

#include <cstddef>
#include <cstring>

namespace platform::x11 {

namespace {

/// Of more rectangles than that, only what lies around them is taken.
constexpr std::size_t MOST_TOLD_RECTANGLES = 256;

PixelRect RectFrom(const xcb_rectangle_t& rect) {
    return {rect.x, rect.y, rect.x + rect.width, rect.y + rect.height};
}

} // namespace

void RootDamage::Start() {
    m_due = true;
    m_unanswered = false;
    const Extensions& has = m_connection.Has();
    if (IsWatched() || !has.damage || !has.xfixes)
        return;
    m_region = m_connection.NewId();
    xcb_xfixes_create_region(m_connection.Get(), m_region, 0, nullptr);
    m_damage = m_connection.NewId();
    xcb_damage_create(m_connection.Get(), m_damage, m_connection.Root(), XCB_DAMAGE_REPORT_LEVEL_NON_EMPTY);
}

void RootDamage::Stop() {
    m_due = false;
    if (!IsWatched())
        return;
    xcb_damage_destroy(m_connection.Get(), m_damage);
    xcb_xfixes_destroy_region(m_connection.Get(), m_region);
    m_damage = 0;
}

bool RootDamage::OnEvent(const xcb_generic_event_t& event) {
    const std::uint8_t first = m_connection.Has().damageEvent;
    if (!IsWatched() || first == 0 || (event.response_type & 0x7F) != first + XCB_DAMAGE_NOTIFY)
        return false;
    if (reinterpret_cast<const xcb_damage_notify_event_t&>(event).damage != m_damage)
        return false;
    // One from before the last question was answered with it.
    const bool isAnswered = static_cast<std::int32_t>(event.full_sequence - m_asked) < 0;
    m_due = m_due || !isAnswered;
    return true;
}

RootDamage::Question RootDamage::Ask() {
    // What a question that nobody has waited for has taken out of the server is not known.
    const bool isLost = m_unanswered;
    m_unanswered = true;
    m_due = true;
    Question question;
    question.root =
        m_connection.Ask<xcb_get_geometry_reply_t>(xcb_get_geometry(m_connection.Get(), m_connection.Root()));
    if (IsWatched()) {
        m_asked = xcb_damage_subtract(m_connection.Get(), m_damage, XCB_NONE, m_region).sequence;
        if (!isLost)
            question.region = m_connection.Ask<xcb_xfixes_fetch_region_reply_t>(
                xcb_xfixes_fetch_region(m_connection.Get(), m_region));
    }
    question.isWhole = isLost || !IsWatched();
    return question;
}

PixelRegion RootDamage::Await(Question& question) {
    if (const auto root = m_connection.Await(question.root); root != nullptr)
        m_root = {0, 0, root->width, root->height};
    PixelRegion region(m_root);
    if (!question.isWhole) {
        if (const auto reply = m_connection.Await(question.region); reply != nullptr)
            region = RegionFrom(*reply);
    }
    m_unanswered = false;
    m_due = !IsWatched();
    return region;
}

PixelRegion RootDamage::RegionFrom(const xcb_xfixes_fetch_region_reply_t& reply) {
    const std::span<const std::uint8_t> bytes = BytesBehind(reply);
    const std::size_t count = bytes.size() / sizeof(xcb_rectangle_t);
    if (count > MOST_TOLD_RECTANGLES)
        return PixelRegion(RectFrom(reply.extents));
    PixelRegion region;
    for (std::size_t i = 0; i < count; ++i) {
        xcb_rectangle_t rect{};
        std::memcpy(&rect, bytes.data() + i * sizeof rect, sizeof rect);
        region.Add(RectFrom(rect));
    }
    return region;
}

} // namespace platform::x11
