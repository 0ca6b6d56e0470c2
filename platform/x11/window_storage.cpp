// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/window_storage.h"

#include "platform/x11/fetch_plan.h"
#include "platform/x11/paint_nudge.h"
#include "platform/x11/server_replies.h"
#include "util/cm_clock.h"

#include <xcb/composite.h>

#include <algorithm>
#include <utility>

namespace platform::x11 {

namespace {

/// A window that paints in thousands of little strokes would fill the socket.
constexpr unsigned MOST_REPORTS = 256;
/// Of more rectangles of damage than that, some are told by what lies around them.
constexpr std::size_t MOST_RECTANGLES = 64;
/// Pixels are asked for ahead when they have no more bytes than that: few are wasted where they are the wrong
/// ones.
constexpr std::size_t MOST_BYTES_AHEAD = std::size_t{64} << 10U;
/// Whole rows are asked for ahead when they were damaged so often in a row.
constexpr unsigned REPEATS_BEFORE_ROWS = 3;
/// How far beside what was damaged last; letters come one after the other.
constexpr int LETTERS_WIDE = 32;
/// Set when another rectangle of the same report follows.
constexpr std::uint8_t MORE_FOLLOW = 0x80;

} // namespace

// ---- DamageWatch

void DamageWatch::Begin(X11Connection& connection, xcb_window_t window, std::uint8_t level) {
    End();
    m_damage = connection.NewId();
    m_connection = &connection;
    CountFrom(xcb_damage_create(connection.Get(), m_damage, window, level).sequence + 1);
    // A new watch begins by telling what is there. What comes later has to have another number.
    xcb_no_operation(connection.Get());
}

void DamageWatch::End() {
    if (m_damage == 0)
        return;
    xcb_damage_destroy(m_connection->Get(), m_damage);
    m_damage = 0;
}

// ---- What is told of it

WindowStorage::WindowStorage(X11Connection& connection, xcb_window_t window)
    : m_connection(connection),
      m_window(window) {}

WindowStorage::~WindowStorage() {
    ForgetPixmap();
}

void WindowStorage::SetSize(int width, int height, int border) {
    m_width = width;
    m_height = height;
    m_border = border;
}

void WindowStorage::OnAdded(const TopLevel& told, Nanoseconds now) {
    SetSize(told.StorageWidth(), told.StorageHeight(), told.border);
    m_mapped = told.mapped;
    m_proof.Renew({m_width, m_height, m_border}, false, now);
    WatchPaintings(now);
    m_connection.Flush(); // each moment counts
}

void WindowStorage::TrustMapped(int width, int height, int border, const PixelRegion& covered,
                                Nanoseconds now) {
    SetSize(width, height, border);
    m_mapped = true;
    m_proof.Trust({width, height, border}, covered, now);
    if (!m_proof.IsProven())
        WatchPaintings(now);
}

void WindowStorage::OnRenewed(const TopLevel& told, unsigned sequence, Nanoseconds now) {
    SetSize(told.StorageWidth(), told.StorageHeight(), told.border);
    Void();
    const bool wasMapped = std::exchange(m_mapped, told.mapped);
    if (!m_mapped)
        return;
    // When it was resized, its own changes and those of the storage aren't told apart.
    const bool watched = !wasMapped && m_paintings.IsOn() && m_paintings.Counts(sequence);
    if (!watched) {
        WatchPaintings(now);
        m_connection.Flush(); // each moment counts
    }
    m_proof.Renew({m_width, m_height, m_border}, watched, now);
    m_watchedSince = now;
    m_reports = 0;
}

void WindowStorage::OnUnmapped() {
    m_mapped = false;
    Void();
    if (m_paintings.IsOn())
        return;
    WatchPaintings(CmSteadyNow());
    m_connection.Flush(); // before it is mapped again
}

void WindowStorage::OnGone() {
    Void();
    m_paintings.End();
    m_changes.End();
}

/// What was fetched shows a storage that isn't the window's any more.
void WindowStorage::Void() {
    ForgetPixmap();
    ForgetPixels();
    m_damagedLast = {};
    m_repeats = 0;
    ++m_renewals;
}

bool WindowStorage::OnRearranged(unsigned sequence) {
    if (m_proof.IsProven())
        return false;
    m_proof.OnRearranged(sequence);
    return m_mapped && m_paintings.IsOn();
}

bool WindowStorage::OnRearrangedInside(unsigned sequence) {
    if (m_proof.IsProven() || !m_mapped)
        return false;
    m_proof.OnRearrangedInside(sequence, m_paintings.IsOn());
    ++m_renewals; // what is being fetched may show what was moved
    return m_paintings.IsOn();
}

void WindowStorage::Confirm(unsigned sequence) {
    m_proof.Confirm(sequence);
    if (m_proof.IsProven())
        m_paintings.End();
}

bool WindowStorage::OnDamage(const xcb_damage_notify_event_t& event, unsigned sequence) {
    if (m_changes.IsOn() && event.damage == m_changes.Get()) {
        m_changed = m_changed || m_changes.Counts(sequence);
        return true;
    }
    if (!m_paintings.IsOn() || event.damage != m_paintings.Get())
        return false;
    const int left = event.area.x + m_border;
    const int top = event.area.y + m_border;
    const PixelRect rect{left, top, left + event.area.width, top + event.area.height};
    if (m_proof.OnDamage({rect, (event.level & MORE_FOLLOW) != 0, sequence}))
        ++m_renewals;
    if (++m_reports > MOST_REPORTS)
        m_paintings.End();
    return true;
}

// ---- Watching it

void WindowStorage::WatchPaintings(Nanoseconds now) {
    // With rearrangements of what is directly inside it. The tree asks for the same where it needs them.
    constexpr std::uint32_t EVENTS = XCB_EVENT_MASK_PROPERTY_CHANGE | XCB_EVENT_MASK_SUBSTRUCTURE_NOTIFY;
    xcb_change_window_attributes(m_connection.Get(), m_window, XCB_CW_EVENT_MASK, &EVENTS);
    m_paintings.Begin(m_connection, m_window, XCB_DAMAGE_REPORT_LEVEL_RAW_RECTANGLES);
    m_proof.CountFrom(m_paintings.CountsFrom());
    m_reports = 0;
    m_watchedSince = now;
}

bool WindowStorage::Ask(const std::optional<PixelRegion>& shape, Nanoseconds now) {
    const bool isWanted = m_asked && now - *m_asked <= WANTED_TIME;
    if (!isWanted)
        m_proof.StartNudging(now);
    m_asked = now;
    if (m_proof.IsProven()) {
        m_paintings.End();
        return !isWanted;
    }
    PixelRegion missing = m_proof.Unproven();
    if (shape)
        missing.Intersect(*shape);
    if (missing.IsEmpty())
        m_paintings.End();
    else if (!m_paintings.IsOn())
        WatchPaintings(now);
    return true;
}

std::optional<std::chrono::nanoseconds> WindowStorage::WatchEnds() const {
    if (!m_paintings.IsOn() || !m_mapped)
        return std::nullopt;
    return std::max(m_watchedSince, m_asked.value_or(Nanoseconds{0})) + WANTED_TIME;
}

std::optional<std::chrono::nanoseconds> WindowStorage::KeepingEnds() const {
    if (!m_asked || (m_pixels.block == nullptr && m_picture == nullptr && !m_changes.IsOn()))
        return std::nullopt;
    const bool isLast = !m_mapped && m_picture != nullptr;
    return *m_asked + (isLast ? LAST_PICTURE_TIME : WANTED_TIME);
}

std::optional<std::chrono::nanoseconds> WindowStorage::NudgeTime() const {
    if (!m_mapped || !m_asked || !m_paintings.IsOn() || m_proof.IsAnythingUnconfirmed())
        return std::nullopt;
    return m_proof.NextNudge();
}

std::optional<std::chrono::nanoseconds> WindowStorage::NextDue() const {
    std::optional<Nanoseconds> next;
    for (const std::optional<Nanoseconds>& due : {WatchEnds(), KeepingEnds(), NudgeTime()}) {
        if (due && (!next || *due < *next))
            next = due;
    }
    return next;
}

void WindowStorage::DoDue(Nanoseconds now) {
    const auto isDue = [now](const std::optional<Nanoseconds>& due) { return due && *due <= now; };
    if (isDue(WatchEnds()))
        m_paintings.End();
    if (isDue(KeepingEnds()))
        Drop();
    if (isDue(NudgeTime()))
        NudgeToPaint(m_connection, m_window, m_border, m_proof.Unproven(), m_proof.TakeNudge(now));
}

// ---- Fetching it

bool WindowStorage::HasPixels(const ServerPixels& pixels) const {
    return m_pixels.IsOf(m_width, m_height, pixels) && m_pixels.unproven == m_proof.Unproven();
}

bool WindowStorage::IsCurrent(const ServerPixels& pixels) const {
    return !m_changed && m_questions.empty() && m_damage.IsEmpty() && HasPixels(pixels);
}

xcb_pixmap_t WindowStorage::Pixmap() {
    if (m_pixmap == 0) {
        m_pixmap = m_connection.NewId();
        xcb_composite_name_window_pixmap(m_connection.Get(), m_window, m_pixmap);
    }
    return m_pixmap;
}

void WindowStorage::ForgetPixmap() {
    if (m_pixmap != 0)
        xcb_free_pixmap(m_connection.Get(), m_pixmap);
    m_pixmap = 0;
}

void WindowStorage::CountChanges() {
    if (!m_changes.IsOn())
        m_changes.Begin(m_connection, m_window, XCB_DAMAGE_REPORT_LEVEL_NON_EMPTY);
    m_changes.CountFrom(xcb_damage_subtract(m_connection.Get(), m_changes.Get(), 0, 0).sequence);
    m_changed = false;
}

void WindowStorage::AskForDamage(xcb_xfixes_region_t parts) {
    // What is damaged now may be painted since.
    DropAhead();
    m_questions.reserve(m_questions.size() + 1); // once it is asked, the answer must not be missed
    m_changes.CountFrom(xcb_damage_subtract(m_connection.Get(), m_changes.Get(), 0, parts).sequence);
    m_questions.push_back(m_connection.Ask<xcb_xfixes_fetch_region_reply_t>(
        xcb_xfixes_fetch_region(m_connection.Get(), parts)));
    m_changed = false;
}

std::size_t WindowStorage::AskAheadForPixels(SharedPixelsPool& pool) {
    const bool isKnown = m_damagedLast.left < m_damagedLast.right && m_damagedLast.top < m_damagedLast.bottom;
    if (!isKnown || !m_pixels.IsOf(m_width, m_height, m_pixels.pixels))
        return 0;
    const bool isOfRows = IsReadAsRows(m_damagedLast.right - m_damagedLast.left, m_width);
    return isOfRows && m_repeats >= REPEATS_BEFORE_ROWS ? AskAheadForRows() : AskAheadForPart(pool);
}

std::size_t WindowStorage::AskAheadForPart(SharedPixelsPool& pool) {
    const PixelRect likely{std::max(m_damagedLast.left - LETTERS_WIDE, 0), m_damagedLast.top,
                           std::min(m_damagedLast.right + LETTERS_WIDE, m_width), m_damagedLast.bottom};
    const int width = likely.right - likely.left;
    const std::size_t bytes =
        m_pixels.pixels.BytesPerRow(width) * static_cast<std::size_t>(likely.bottom - likely.top);
    std::shared_ptr<SharedPixels> block = bytes <= MOST_BYTES_AHEAD ? pool.Take(bytes) : nullptr;
    if (block == nullptr)
        return 0;
    RowsRead read = RowsRead::Ask(m_connection, Pixmap(), likely.left, likely.top, width, likely.bottom,
                                  *block, 0, m_pixels.pixels.BytesPerPixel());
    m_ahead.emplace(PixelsAhead{likely, false, std::move(block), std::move(read), m_renewals});
    return bytes;
}

/// Only where nobody holds what is there now.
std::size_t WindowStorage::AskAheadForRows() {
    LetGoOfPictureIfAlone();
    if (!IsOnlyShare(m_pixels.block))
        return 0;
    const PixelRect rows{0, m_damagedLast.top, m_width, m_damagedLast.bottom};
    const std::size_t offset = static_cast<std::size_t>(rows.top) * m_pixels.Stride();
    RowsRead read = RowsRead::Ask(m_connection, Pixmap(), 0, rows.top, m_width, rows.bottom, *m_pixels.block,
                                  offset, m_pixels.pixels.BytesPerPixel());
    m_ahead.emplace(PixelsAhead{rows, true, m_pixels.block, std::move(read), m_renewals});
    return static_cast<std::size_t>(rows.bottom - rows.top) * m_pixels.Stride();
}

std::optional<PixelsAhead> WindowStorage::TakeAhead() {
    if (!m_ahead)
        return std::nullopt;
    PixelRegion beyond = m_damage;
    beyond.Subtract(m_ahead->rect);
    if (m_damage.IsEmpty() || !beyond.IsEmpty() || m_ahead->renewals != m_renewals) {
        DropAhead();
        return std::nullopt;
    }
    return std::exchange(m_ahead, std::nullopt);
}

/// The answer is mostly here: then the memory can be used again. Without it the server may still write there.
void WindowStorage::DropAhead() {
    std::optional<PixelsAhead> ahead = std::exchange(m_ahead, std::nullopt);
    if (!ahead)
        return;
    if (ahead->isOfRows)
        m_damage.Add(ahead->rect);
    ahead->read.Finish(m_connection);
}

bool WindowStorage::AwaitDamage() {
    // What the server has counted off is known to nobody else: without the answer there are no pixels.
    StoredPixels pixels = std::exchange(m_pixels, StoredPixels());
    for (auto& question : m_questions) {
        const auto answer = m_connection.Await(question);
        if (answer == nullptr)
            return false;
        AddDamage(*answer);
    }
    m_questions.clear();
    m_pixels = std::move(pixels);
    return true;
}

void WindowStorage::AddDamage(const xcb_xfixes_fetch_region_reply_t& answer) {
    const PixelRect all{0, 0, m_width, m_height};
    std::vector<PixelRect> rects;
    for (const xcb_rectangle_t& each : RectanglesFrom(answer)) {
        const int left = each.x + m_border;
        const int top = each.y + m_border;
        rects.push_back({left, top, left + each.width, top + each.height});
    }
    for (const PixelRect& rect : FewerRects(rects, MOST_RECTANGLES))
        m_damage.Add(rect);
    m_damage.Intersect(all);
    NoteDamageIn(m_damage.Bounds());
}

void WindowStorage::NoteDamageIn(const PixelRect& around) {
    m_repeats = around == m_damagedLast ? m_repeats + 1 : 0;
    m_damagedLast = around;
}

/// Until they are given back there are none, and nothing is known to be damaged.
StoredPixels WindowStorage::TakePixels() {
    LetGoOfPictureIfAlone();
    StoredPixels pixels = std::move(m_pixels);
    ForgetPixels();
    return pixels;
}

void WindowStorage::ForgetPixels() {
    m_pixels = StoredPixels();
    m_questions.clear();
    m_ahead.reset();
    m_damage.Clear();
}

/// If nobody else has the picture, its memory is to be written to.
void WindowStorage::LetGoOfPictureIfAlone() {
    if (m_picture != nullptr && !m_isPictureCopied && IsOnlyShare(m_picture))
        LetGoOfPicture();
}

/// How later ones come out of it is told all the same.
void WindowStorage::LetGoOfPicture() {
    m_former.serial = m_picture->serial;
    m_former.steps = std::move(m_picture->steps);
    m_former.format = m_picture->format;
    m_picture.reset();
}

void WindowStorage::GivePixels(StoredPixels pixels, const PixelRegion& changed) {
    m_unshown.Add(changed);
    m_pixels = std::move(pixels);
}

// ---- Keeping it

std::size_t WindowStorage::KeptBytes() const {
    std::size_t bytes = m_pixels.block != nullptr ? m_pixels.block->Size() : 0;
    if (m_picture != nullptr && (m_isPictureCopied || m_pixels.block == nullptr))
        bytes += m_picture->stride * static_cast<std::size_t>(m_picture->height);
    return bytes;
}

bool WindowStorage::IsHeldByOthers() const {
    return m_picture != nullptr && !IsOnlyShare(m_picture);
}

void WindowStorage::Drop() {
    ForgetPixmap();
    m_changes.End();
    ForgetPixels();
    m_picture.reset();
    m_former = Picture();
}

} // namespace platform::x11
