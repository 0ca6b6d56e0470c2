// SPDX-License-Identifier: Apache-2.0
#include "tests/privacy/privacy_oracle.h"

namespace {

/// A window's frame in the pixels of a frame, not cut to whole ones.
struct ProjectedWindow {
    double left;
    double top;
    double right;
    double bottom;
    const PrivacyWindow* window;
};

enum class PixelPlace {
    Outside,
    AtAnEdge, ///< Within a pixel of it, on either side.
    Inside,
};

enum class PixelKind {
    Forbidden,
    NearAnEdge,
    ThroughKept,
    Elsewhere,
};

struct PixelJudgement {
    PixelKind kind;
    /// The opaque kept window that is in front of everything here, or null.
    const PrivacyWindow* keptInFront;
};

/// One that is kept still counts: where it is, the share takes what is seen for the share's own.
bool IsUnseen(const PrivacyWindow& window) {
    return !(window.alpha > 0) && window.role == PrivacyRole::KeptOut;
}

std::vector<ProjectedWindow> Project(const PrivacyMoment& moment, const PrivacyFrame& frame) {
    const double x = frame.rect.origin.x;
    const double y = frame.rect.origin.y;
    const double across = frame.width / static_cast<double>(frame.rect.size.width);
    const double down = frame.height / static_cast<double>(frame.rect.size.height);
    std::vector<ProjectedWindow> projected;
    for (const PrivacyWindow& window : moment) {
        if (IsUnseen(window))
            continue;
        const double left = window.frame.origin.x;
        const double top = window.frame.origin.y;
        projected.push_back({(left - x) * across, (top - y) * down,
                             (left + static_cast<double>(window.frame.size.width) - x) * across,
                             (top + static_cast<double>(window.frame.size.height) - y) * down, &window});
    }
    return projected;
}

PixelPlace PlaceOf(int x, int y, const ProjectedWindow& window) {
    constexpr double EDGE = 1;
    if (x >= window.left + EDGE && x + 1 <= window.right - EDGE && y >= window.top + EDGE &&
        y + 1 <= window.bottom - EDGE)
        return PixelPlace::Inside;
    if (x >= window.right + EDGE || x + 1 <= window.left - EDGE || y >= window.bottom + EDGE ||
        y + 1 <= window.top - EDGE)
        return PixelPlace::Outside;
    return PixelPlace::AtAnEdge;
}

bool IsOpaque(const PrivacyWindow& window) {
    return window.alpha >= 1 && window.givesPixels;
}

/// From the front to the back, up to the first thing that decides. What is kept out stays forbidden behind
/// something kept that is opaque: it can only be seen by mistake there.
PixelJudgement JudgePixel(int x, int y, const std::vector<ProjectedWindow>& frontFirst) {
    const PrivacyWindow* keptInFront = nullptr;
    bool isCovered = false;
    bool showsThrough = false;
    for (const ProjectedWindow& projected : frontFirst) {
        const PrivacyWindow& window = *projected.window;
        const PixelPlace place = PlaceOf(x, y, projected);
        if (place == PixelPlace::Outside || (isCovered && place == PixelPlace::AtAnEdge))
            continue;
        if (place == PixelPlace::AtAnEdge)
            return {PixelKind::NearAnEdge, nullptr};
        if (window.role == PrivacyRole::KeptOut)
            return {showsThrough && !isCovered ? PixelKind::ThroughKept : PixelKind::Forbidden, keptInFront};
        if (isCovered)
            continue;
        if (!IsOpaque(window)) {
            showsThrough = true;
            continue;
        }
        isCovered = true;
        if (!showsThrough)
            keptInFront = &window;
    }
    return {PixelKind::Elsewhere, keptInFront};
}

void CountRed(PixelKind kind, PrivacyFindings& findings) {
    switch (kind) {
        case PixelKind::Forbidden:
            ++findings.leaks;
            break;
        case PixelKind::NearAnEdge:
            ++findings.redNearEdges;
            break;
        case PixelKind::ThroughKept:
            ++findings.redThroughKept;
            break;
        case PixelKind::Elsewhere:
            ++findings.redElsewhere;
            break;
    }
}

} // namespace

PrivacyFindings& PrivacyFindings::operator+=(const PrivacyFindings& other) {
    forbidden += other.forbidden;
    leaks += other.leaks;
    redNearEdges += other.redNearEdges;
    redThroughKept += other.redThroughKept;
    redElsewhere += other.redElsewhere;
    keptInFront += other.keptInFront;
    keptShown += other.keptShown;
    return *this;
}

PrivacyFindings JudgePrivacy(const PrivacyMoment& moment, const PrivacyFrame& frame) {
    const std::vector<ProjectedWindow> windows = Project(moment, frame);
    PrivacyFindings findings;
    for (int y = 0; y < frame.height; ++y) {
        const std::uint8_t* pixel = frame.pixels + static_cast<std::size_t>(y) * frame.stride;
        for (int x = 0; x < frame.width; ++x, pixel += 4) {
            const PixelJudgement judged = JudgePixel(x, y, windows);
            findings.forbidden += judged.kind == PixelKind::Forbidden ? 1 : 0;
            if (pixel[frame.red] != 0)
                CountRed(judged.kind, findings);
            if (judged.keptInFront == nullptr)
                continue;
            ++findings.keptInFront;
            const unsigned rgb = static_cast<unsigned>(pixel[frame.red]) << 16 |
                                 static_cast<unsigned>(pixel[frame.green]) << 8 | pixel[frame.blue];
            findings.keptShown += rgb == judged.keptInFront->rgb ? 1 : 0;
        }
    }
    return findings;
}

std::string ToString(const PrivacyFindings& findings) {
    return std::to_string(findings.forbidden) + " forbidden pixels, " + std::to_string(findings.leaks) +
           " leaks; other red ones: " + std::to_string(findings.redNearEdges) + " near edges, " +
           std::to_string(findings.redThroughKept) + " through kept windows, " +
           std::to_string(findings.redElsewhere) + " elsewhere; kept in front " +
           std::to_string(findings.keptInFront) + ", shown " + std::to_string(findings.keptShown);
}
