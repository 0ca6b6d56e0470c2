// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/paint_proof.h"

#include <algorithm>
#include <array>
#include <cstddef>

namespace platform::x11 {

namespace {

using namespace std::chrono_literals;

struct NudgePlan {
    std::chrono::nanoseconds after; // the one before it
    PaintProof::Nudge nudge;
};

/// The last one comes again and again: however late a client is, and whatever of its paintings counted for
/// nothing since windows were rearranged, it is asked once more when it has time and they are at rest.
constexpr std::array<NudgePlan, 7> NUDGES{{
    {40ms, PaintProof::Nudge::TellExposure},
    {160ms, PaintProof::Nudge::TellExposure},
    {300ms, PaintProof::Nudge::ClearAndExpose},
    {500ms, PaintProof::Nudge::ClearAndExpose},
    {2s, PaintProof::Nudge::TellExposure},
    {4s, PaintProof::Nudge::TellExposure},
    {10s, PaintProof::Nudge::TellExposure},
}};

} // namespace

void PaintProof::Renew(const Size& size, bool watched, Nanoseconds now) {
    m_all = {0, 0, size.width, size.height};
    m_inside = {size.border, size.border, size.width - size.border, size.height - size.border};
    m_unproven = PixelRegion(m_all);
    m_isAppearanceDue = watched;
    m_unconfirmed.clear();
    m_movedInside.reset();
    StartNudging(now);
}

void PaintProof::Trust(const Size& size, const PixelRegion& covered, Nanoseconds now) {
    Renew(size, false, now);
    m_unproven.Intersect(covered);
}

void PaintProof::StartNudging(Nanoseconds now) {
    m_nudged = now;
    m_nudges = 0;
}

bool PaintProof::OnDamage(const DamageReport& report) {
    Confirm(report.sequence);
    if (m_isAppearanceDue) {
        m_isAppearanceDue = report.more;
        return false;
    }
    if (m_movedInside == report.sequence) {
        Lose(report.rect);
        return true;
    }
    if (!IsEarlier(report.sequence, m_countFrom))
        m_unconfirmed.push_back(report);
    return false;
}

void PaintProof::Lose(const PixelRect& rect) {
    m_unproven.Add(rect);
    m_unproven.Intersect(m_all);
}

PixelRegion PaintProof::PaintedBy(const DamageReport& report) const {
    const PixelRect& rect = report.rect;
    PixelRegion painted(rect);
    if (rect.left < m_inside.left || rect.top < m_inside.top || rect.right > m_inside.right ||
        rect.bottom > m_inside.bottom)
        painted.Subtract(m_inside);
    return painted;
}

void PaintProof::OnRearrangedInside(unsigned sequence, bool watched) {
    Confirm(sequence); // what was painted before has been moved over
    if (IsProven())
        return;
    m_movedInside = sequence;
    for (const DamageReport& report : m_unconfirmed)
        Lose(report.rect);
    if (!watched)
        Lose(m_all);
    OnRearranged(sequence);
}

void PaintProof::OnRearranged(unsigned sequence) {
    Confirm(sequence);
    m_unconfirmed.clear();
    if (IsEarlier(m_countFrom, sequence + 1))
        m_countFrom = sequence + 1;
}

void PaintProof::Confirm(unsigned sequence) {
    auto report = m_unconfirmed.begin();
    for (; report != m_unconfirmed.end() && IsEarlier(report->sequence, sequence); ++report)
        m_unproven.Subtract(PaintedBy(*report));
    m_unconfirmed.erase(m_unconfirmed.begin(), report);
}

std::optional<std::chrono::nanoseconds> PaintProof::NextNudge() const {
    if (IsProven())
        return std::nullopt;
    return m_nudged + NUDGES[m_nudges].after;
}

PaintProof::Nudge PaintProof::TakeNudge(Nanoseconds now) {
    const Nudge nudge = NUDGES[m_nudges].nudge;
    m_nudged = now;
    m_nudges = std::min(m_nudges + 1, NUDGES.size() - 1);
    return nudge;
}

} // namespace platform::x11
