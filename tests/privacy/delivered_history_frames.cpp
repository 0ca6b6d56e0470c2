// SPDX-License-Identifier: Apache-2.0
#include "tests/privacy/delivered_history.h"
#include "util/cm_clock.h"

#include <algorithm>
#include <sstream>

/// The half of a history that looks at what the client got.

namespace {

PrivacyFrame PixelsOf(IShareFrame& frame, const TVLSize& size) {
    PrivacyFrame judged;
    judged.pixels = frame.GetFrameData();
    judged.stride = static_cast<std::size_t>(frame.GetFrameLineBytes());
    judged.width = size.cx;
    judged.height = size.cy;
    if (frame.GetFrameDataFormat() == SHARE_FRAME_FORMAT_ARGB) {
        judged.red = 1;
        judged.green = 2;
        judged.blue = 3;
    }
    return judged;
}

/// Red that no moment should have shown.
long Unexplained(const PrivacyFindings& findings) {
    return findings.leaks + findings.redElsewhere;
}

std::string ToString(const platform::CGRect& rect) {
    std::ostringstream text;
    text << rect.origin.x << ',' << rect.origin.y << ' ' << rect.size.width << 'x' << rect.size.height;
    return text.str();
}

/// Where a frame is red, and what should be there.
std::string Describe(const PrivacyFrame& frame, const PrivacyMoment& moment) {
    int left = frame.width;
    int top = frame.height;
    int right = 0;
    int bottom = 0;
    for (int y = 0; y < frame.height; ++y) {
        const std::uint8_t* pixel = frame.pixels + static_cast<std::size_t>(y) * frame.stride + frame.red;
        for (int x = 0; x < frame.width; ++x, pixel += 4) {
            if (*pixel == 0)
                continue;
            left = std::min(left, x);
            top = std::min(top, y);
            right = std::max(right, x + 1);
            bottom = std::max(bottom, y + 1);
        }
    }
    std::ostringstream text;
    text << "\n  first in a frame of " << frame.width << 'x' << frame.height << " that shows "
         << ToString(frame.rect) << ", red from " << left << ',' << top << " to " << right << ',' << bottom;
    for (const PrivacyWindow& window : moment)
        text << "\n    " << (window.role == PrivacyRole::Kept ? "kept " : "kept out ")
             << ToString(window.frame) << " alpha " << window.alpha
             << (window.givesPixels ? "" : " unshared");
    return text.str();
}

} // namespace

// ---- What a client got

PrivacyMoment DeliveredHistory::Moment() const {
    PrivacyMoment moment;
    const auto snapshot = m_server->GetWindows();
    for (const platform::WindowInfo& info : snapshot->Windows()) {
        const auto window = std::find_if(m_windows.begin(), m_windows.end(),
                                         [&](const Window& each) { return each.id == info.id; });
        if (window == m_windows.end() || !info.onScreen)
            continue;
        // In a picture of a display it isn't there.
        if (m_kind.IsOfSession() && window->isSecretOfServer && !IsKeptOut(*window))
            continue;
        moment.push_back({MustNotBeSeen(*window) ? PrivacyRole::KeptOut : PrivacyRole::Kept, info.frame,
                          window->rgb, info.alpha, !window->isSecretOfServer});
    }
    return moment;
}

void DeliveredHistory::Look(IShareFrame& frame) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    DeliveredCounts counts;
    Judge(frame, counts);
    const bool isExposed = IsLeak(m_kind, counts);
    if (isExposed && counts.firstLeak.empty())
        counts.firstLeak = "\n  first at a moment that it should not have been taken at";
    m_counts += counts;
    if (isExposed || counts.reshaped == 0)
        NoteExposure(isExposed);
}

void DeliveredHistory::Judge(IShareFrame& frame, DeliveredCounts& counts) {
    const TVLSize size = SizeOf(frame);
    const TVLRect rect = frame.GetMetaInfo().rectCapture;
    counts.frames = 1;
    // A new picture is in the engine's other frame.
    const bool isResent = &frame == m_lastFrame;
    if (isResent)
        counts.resent = 1;
    else if (const Taken* const taken = TakenAs(frame))
        m_shown = *taken;
    else
        counts.ofNoMoment = 1;
    counts.ofBefore = m_shown.step < m_stepOfSecret ? 1 : 0;
    m_lastFrame = &frame;
    // A new size of the display makes frames as large before there is a picture for them: what is sent again
    // is what was seen before, with its rows in other places.
    if (isResent && size != m_lastSize) {
        counts.reshaped = 1;
        return;
    }
    m_lastSize = size;
    if (size.cx == 0 || size.cy == 0 || rect.left == rect.right || rect.top == rect.bottom)
        return;
    PrivacyFrame judged = PixelsOf(frame, size);
    judged.rect = {{static_cast<float>(rect.left), static_cast<float>(rect.top)},
                   {static_cast<float>(rect.right - rect.left), static_cast<float>(rect.bottom - rect.top)}};
    counts.findings = JudgeBest(judged);
    if (!isResent && !m_shown.isDisturbed)
        LookForLife(judged, counts);
    if ((IsLeak(m_kind, counts) || IsDead(m_kind, counts)) && !m_shown.moments.empty())
        counts.firstLeak = Describe(judged, m_shown.moments.back());
}

/// What a viewer got stays before his eyes until he gets something else.
void DeliveredHistory::NoteExposure(bool isExposed) {
    const std::chrono::nanoseconds now = CmSteadyNow();
    if (m_exposedSince) {
        const auto exposure = std::chrono::duration_cast<std::chrono::milliseconds>(now - *m_exposedSince);
        m_counts.longestExposure = std::max(m_counts.longestExposure, exposure);
    }
    if (!isExposed)
        m_exposedSince.reset();
    else if (!m_exposedSince)
        m_exposedSince = now;
}

DeliveredCounts DeliveredHistory::End() {
    const std::lock_guard<std::mutex> lock(m_mutex);
    NoteExposure(false);
    return m_counts;
}

/// By the moment that explains the frame best: it shows one of them.
PrivacyFindings DeliveredHistory::JudgeBest(const PrivacyFrame& frame) const {
    PrivacyFindings best;
    bool isFirst = true;
    for (const PrivacyMoment& moment : m_shown.moments) {
        const PrivacyFindings findings = JudgePrivacy(moment, frame);
        if (isFirst || Unexplained(findings) < Unexplained(best))
            best = findings;
        isFirst = false;
    }
    return best;
}

const DeliveredHistory::Taken* DeliveredHistory::TakenAs(IShareFrame& frame) {
    const auto found = m_taken.find(frame.GetTimestamp());
    return found != m_taken.end() ? &found->second : nullptr;
}

/// A share of windows shows one display, as large as it was at first, and by pictures of its windows it
/// leaves those out that are kept but lie on another one. For where it is, a window counts that gives no
/// pixels.
bool DeliveredHistory::ShowsAllThatIsKept(const PrivacyFrame& frame) const {
    if (m_kind.IsOfDesktop() || m_kind.IsOfSession())
        return true;
    const PrivacyMoment& all = m_shown.moments.front();
    return !m_wasResized && std::all_of(all.begin(), all.end(), [&](const PrivacyWindow& window) {
        if (window.role == PrivacyRole::KeptOut && window.givesPixels)
            return true;
        return window.frame.origin.x >= frame.rect.origin.x && window.frame.origin.y >= frame.rect.origin.y &&
               window.frame.origin.x + window.frame.size.width <=
                   frame.rect.origin.x + frame.rect.size.width &&
               window.frame.origin.y + window.frame.size.height <=
                   frame.rect.origin.y + frame.rect.size.height;
    });
}

/// Where the pointer may be drawn or the picture is stretched, pixels need not be those of a window.
void DeliveredHistory::LookForLife(const PrivacyFrame& frame, DeliveredCounts& counts) const {
    if (m_shown.hasPointer || m_shown.moments.empty())
        return;
    if (static_cast<float>(frame.width) != frame.rect.size.width ||
        static_cast<float>(frame.height) != frame.rect.size.height)
        return;
    if (!ShowsAllThatIsKept(frame))
        return;
    PrivacyMoment kept = m_shown.moments.front();
    kept.erase(std::remove_if(kept.begin(), kept.end(),
                              [this](const PrivacyWindow& window) {
                                  return m_kind.isOfWindowPictures && window.role == PrivacyRole::KeptOut;
                              }),
               kept.end());
    const PrivacyFindings findings = JudgePrivacy(kept, frame);
    counts.framesForLife = 1;
    counts.keptThere = findings.keptInFront;
    counts.keptShown = findings.keptShown;
    if (m_kind.isOfWindowPictures)
        counts.strange = CountStrange(kept, frame);
}

/// Frames are used again: an old picture may shine through where a new one has nothing.
long DeliveredHistory::CountStrange(const PrivacyMoment& kept, const PrivacyFrame& frame) {
    const auto isThere = [&](int x, int y) {
        const float left = frame.rect.origin.x + static_cast<float>(x);
        const float top = frame.rect.origin.y + static_cast<float>(y);
        return std::any_of(kept.begin(), kept.end(), [&](const PrivacyWindow& window) {
            return left + 1 > window.frame.origin.x && top + 1 > window.frame.origin.y &&
                   left < window.frame.origin.x + window.frame.size.width &&
                   top < window.frame.origin.y + window.frame.size.height;
        });
    };
    long strange = 0;
    for (int y = 0; y < frame.height; ++y) {
        const std::uint8_t* pixel = frame.pixels + static_cast<std::size_t>(y) * frame.stride;
        for (int x = 0; x < frame.width; ++x, pixel += 4) {
            const bool isBlack = pixel[frame.red] == 0 && pixel[frame.green] == 0 && pixel[frame.blue] == 0;
            strange += !isBlack && !isThere(x, y) ? 1 : 0;
        }
    }
    return strange;
}
