// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/pixel_region.h"

#include <chrono>
#include <cstddef>
#include <optional>
#include <vector>

namespace platform::x11 {

/// What a server tells of a painting.
struct DamageReport {
    PixelRect rect;        ///< Of the storage.
    bool more = false;     ///< Another rectangle of the same painting follows.
    unsigned sequence = 0; ///< Of the event: which of our requests the server had done last.
};

/// Which pixels of a window's storage are the window's own. Nothing here talks to the server.
///
/// A new storage starts as a copy of the screen, so it shows what lay behind the window; what is beyond the
/// screen's edges starts as anything. Where the window has painted since, or its background was painted, the
/// pixels are its own.
///
/// The server reports paintings, and more than those: what of a window has become visible on the screen is
/// reported too, although nothing was painted, when the window is mapped or when windows are rearranged. On
/// mapping it is the first report. A rearrangement is told by an event of its own, which has the same
/// sequence number as the reports, but may come after them; so a report is believed only when an event or
/// an answer with a later number is here and no rearrangement had its own.
///
/// Of a border the whole window is reported, although nothing inside was painted. No client paints beyond the
/// inside, so what reaches there is of the border.
///
/// When windows are moved inside the window, pixels are moved, and with them such as aren't its own. That is
/// reported like a painting too, and what is reported isn't proven any more.
///
/// Who begins to watch after the storage was made may have missed paintings: then the window is asked to
/// paint again, first by an exposure that is only told, later by one that also has the server paint its
/// background. A painting that came under the number of a rearrangement is missed as well.
class PaintProof {
public:
    using Nanoseconds = std::chrono::nanoseconds;

    enum class Nudge {
        TellExposure,   ///< Send Expose events for what is not proven.
        ClearAndExpose, ///< Have the server clear what is not proven, with exposures.
    };

    /// What is proven of, in pixels; the size is with the border.
    struct Size {
        int width = 0;
        int height = 0;
        int border = 0;
    };

    /// The storage is a new one. `watched`: reports have been coming since before the window was mapped.
    void Renew(const Size& size, bool watched, Nanoseconds now);
    /// All of it is the window's own but `covered`.
    void Trust(const Size& size, const PixelRegion& covered, Nanoseconds now);
    /// Somebody wants to see it again: asking it to paint begins anew.
    void StartNudging(Nanoseconds now);

    /// A watch begins: reports with earlier numbers prove nothing.
    void CountFrom(unsigned sequence) { m_countFrom = sequence; }
    /// True when something isn't proven any more.
    bool OnDamage(const DamageReport& report);
    /// Windows were rearranged, so that more of this one may have become visible.
    void OnRearranged(unsigned sequence);
    /// Windows inside it were; `watched`: reports are coming, which tell where.
    void OnRearrangedInside(unsigned sequence, bool watched);
    /// Every event with a number below this one is here.
    void Confirm(unsigned sequence);
    bool IsAnythingUnconfirmed() const { return !m_unconfirmed.empty(); }

    bool IsProven() const { return m_unproven.IsEmpty(); }
    const PixelRegion& Unproven() const { return m_unproven; }

    /// What is to be done about a window that somebody wants to see and that isn't proven: at 40 ms, 200 ms,
    /// 500 ms and 1 s after it became so, then ever more rarely, at last each 10 s.
    std::optional<Nanoseconds> NextNudge() const;
    /// One that comes late puts the later ones off.
    Nudge TakeNudge(Nanoseconds now);

private:
    PixelRegion PaintedBy(const DamageReport& report) const;
    void Lose(const PixelRect& rect);

    PixelRect m_all;
    PixelRect m_inside; ///< Of the border.
    PixelRegion m_unproven;
    bool m_isAppearanceDue = false; ///< What is reported next is what has become visible by mapping.
    unsigned m_countFrom = 0;
    std::vector<DamageReport> m_unconfirmed; ///< In the order in which they came.
    std::optional<unsigned> m_movedInside;   ///< The last number under which that happened.
    Nanoseconds m_nudged{0};                 ///< When the last one was, at first when it became unproven.
    std::size_t m_nudges = 0;                ///< So many of those that differ.
};

/// Sequence numbers wrap around.
constexpr bool IsEarlier(unsigned sequence, unsigned other) {
    return static_cast<int>(sequence - other) < 0;
}

} // namespace platform::x11
