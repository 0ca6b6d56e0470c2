// SPDX-License-Identifier: Apache-2.0
#include "tests/privacy/thumbnail_judge.h"

#include <algorithm>
#include <cstddef>
#include <cstdio>
#include <iterator>

namespace {

constexpr unsigned NOTHING = 0xFFFFFFFF; // no colour

/// What colours lose when they are dimmed.
constexpr int ROUNDING = 2;

unsigned RgbOf(const unsigned char* pixel) {
    return static_cast<unsigned>(pixel[0]) << 16 | static_cast<unsigned>(pixel[1]) << 8 | pixel[2];
}

bool IsDimmed(const unsigned char* pixel, const ThumbnailTruth& truth) {
    for (int i = 0; i < 3; ++i) {
        const float full = static_cast<float>(truth.rgb >> (16 - 8 * i) & 0xFFU);
        const int wanted = static_cast<int>(full * truth.alpha + 0.5F);
        if (pixel[i] < wanted - ROUNDING || pixel[i] > wanted + ROUNDING)
            return false;
    }
    return true;
}

std::string Hex(unsigned rgb) {
    char text[16];
    std::snprintf(text, sizeof(text), "%06X", rgb);
    return text;
}

} // namespace

ThumbnailFindings& ThumbnailFindings::operator+=(const ThumbnailFindings& other) {
    images += other.images;
    failed += other.failed;
    pixels += other.pixels;
    foreign += other.foreign;
    unasked += other.unasked;
    wholePixels += other.wholePixels;
    wholeShown += other.wholeShown;
    return *this;
}

std::string ToString(const ThumbnailFindings& findings) {
    return std::to_string(findings.images) + " thumbnails of " + std::to_string(findings.pixels) +
           " pixels (and " + std::to_string(findings.failed) + " failed), " +
           std::to_string(findings.foreign) + " pixels of something else, " +
           std::to_string(findings.unasked) + " that nobody asked for, " +
           std::to_string(findings.wholeShown) + " pixels shown of " + std::to_string(findings.wholePixels);
}

void ThumbnailJudge::Expect(const std::vector<ThumbnailTruth>& windows) {
    m_truths.insert(m_truths.end(), windows.begin(), windows.end());
}

void ThumbnailJudge::Forbid() {
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_isForbidden = true;
}

ThumbnailFindings ThumbnailJudge::Findings() const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return m_findings;
}

std::string ThumbnailJudge::FirstLeak() const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return m_firstLeak;
}

// ---- Calls of the thumbnail thread

/// While the owner of a window can't be told it may stand for an application of its own.
bool ThumbnailJudge::onAppThumbnail(unsigned pid, ImageData image, bool failed, bool last) {
    const auto isOfIt = [pid](const ThumbnailTruth& each) {
        return pid == SHARE_INVALID_PROCESS || each.owner == static_cast<pid_t>(pid);
    };
    return Take("application", pid, isOfIt, image, failed, last);
}

bool ThumbnailJudge::onWindowThumbnail(unsigned window, ImageData image, bool failed, bool last) {
    return Take(
        "window", window, [window](const ThumbnailTruth& each) { return each.window == window; }, image,
        failed, last);
}

bool ThumbnailJudge::onThumbnailError(int) {
    m_done.Add();
    return false;
}

bool ThumbnailJudge::Take(const char* kind, unsigned id, const IsOfIt& isOfIt, const ImageData& image,
                          bool failed, bool last) {
    int count = 0;
    {
        const std::lock_guard<std::mutex> lock(m_mutex);
        const std::string name = kind + (" " + std::to_string(id));
        const bool isAsked =
            m_asked.empty() || std::find(m_asked.begin(), m_asked.end(), id) != m_asked.end();
        if (m_isForbidden || !isAsked) {
            ++m_findings.unasked;
            NoteLeak(name + " after the end of its request, or never asked for");
        }
        Candidates candidates;
        std::copy_if(m_truths.begin(), m_truths.end(), std::back_inserter(candidates), isOfIt);
        Judge(name, candidates, image, failed);
        count = ++m_calls;
    }
    if (last)
        m_done.Add();
    return !m_during || m_during(count);
}

void ThumbnailJudge::Judge(const std::string& name, const Candidates& candidates, const ImageData& image,
                           bool failed) {
    const long pixels = static_cast<long>(image.width) * image.height;
    ++(failed ? m_findings.failed : m_findings.images);
    m_findings.pixels += pixels;
    Verdict best{pixels, 0, NOTHING};
    for (const ThumbnailTruth& truth : candidates) {
        const Verdict verdict = Compare(image, truth);
        const bool isBetter = verdict.foreign < best.foreign || best.firstForeign == NOTHING;
        if (isBetter || (verdict.foreign == best.foreign && verdict.shown > best.shown))
            best = verdict;
    }
    m_findings.foreign += best.foreign;
    if (best.foreign > 0)
        NoteLeak(name + " shows " + Hex(best.firstForeign) + " and not " +
                 Hex(candidates.empty() ? 0 : candidates.back().rgb) + ", " + std::to_string(best.foreign) +
                 " of " + std::to_string(pixels) + " pixels");
    const bool isWhole = !m_isHindered && !candidates.empty() &&
                         std::all_of(candidates.begin(), candidates.end(), [](const ThumbnailTruth& each) {
                             return each.givesPixels && each.isOnScreen;
                         });
    if (!isWhole)
        return;
    m_findings.wholePixels += pixels;
    m_findings.wholeShown += best.shown;
    if (best.shown < pixels)
        NoteLeak(name + " shows itself in " + std::to_string(best.shown) + " of " +
                 std::to_string(image.width) + "x" + std::to_string(image.height) + " pixels");
}

/// Where there is nothing, a picture is black. No window is.
ThumbnailJudge::Verdict ThumbnailJudge::Compare(const ImageData& image, const ThumbnailTruth& truth) {
    Verdict verdict;
    for (int y = 0; y < image.height; ++y) {
        const unsigned char* pixel = image.data + static_cast<std::ptrdiff_t>(y) * image.lineBytes;
        for (int x = 0; x < image.width; ++x, pixel += 4) {
            if (truth.givesPixels && IsDimmed(pixel, truth)) {
                ++verdict.shown;
            } else if (RgbOf(pixel) != 0) {
                if (verdict.foreign == 0)
                    verdict.firstForeign = RgbOf(pixel);
                ++verdict.foreign;
            }
        }
    }
    return verdict;
}

void ThumbnailJudge::NoteLeak(const std::string& text) {
    if (m_firstLeak.empty())
        m_firstLeak = "\n  thumbnail of " + text;
}
