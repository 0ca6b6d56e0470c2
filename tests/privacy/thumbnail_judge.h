// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/core_types.h"
#include "tests/support/threads.h"

#include <screenshare/share_thumbnail.h>

#include <sys/types.h>
#include <cstdint>
#include <functional>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

/// What a picture of a window may show: itself, dimmed by its own alpha, and nothing where it gives no
/// pixels.
struct ThumbnailTruth {
    platform::CGWindowID window = 0;
    pid_t owner = 0;
    std::uint32_t rgb = 0; ///< What it is painted with, all over; no two windows are painted the same.
    float alpha = 1.0F;
    bool givesPixels = true;
    bool isOnScreen = true; ///< Else it is remembered in some state or other, perhaps in none.
};

struct ThumbnailFindings {
    long images = 0;
    long failed = 0;
    long pixels = 0;
    /// Pixels that show something else than what the picture is of. The verdict.
    long foreign = 0;
    /// Calls after the request was cancelled, and such for what nobody asked for. None may be.
    long unasked = 0;
    /// Those that had nothing to hinder them from being whole, and of their pixels those that show the
    /// window.
    long wholePixels = 0;
    long wholeShown = 0;

    bool IsLeak() const { return foreign + unasked > 0; }
    bool IsDead() const { return wholeShown != wholePixels; }
    ThumbnailFindings& operator+=(const ThumbnailFindings& other);
};

/// One line for a log.
std::string ToString(const ThumbnailFindings& findings);

/// Takes the pictures of one request in and judges each by the colour of its pixels.
///
/// Threads:  any, beside the calls of the thumbnail thread. `during` runs on that one.
/// Lifetime: like any callback: done or cancelled before it is destroyed.
class ThumbnailJudge final : public ThumbnailCallback {
public:
    /// Called in each call with their number so far, once the picture is judged; false ends the request.
    using During = std::function<bool(int count)>;

    /// `isHindered`: what is asked for changes or fails meanwhile.
    ThumbnailJudge(bool isHindered, During during) : m_isHindered(isHindered), m_during(std::move(during)) {}

    /// From here on the desktop may be like this, too. Held, no picture is judged.
    [[nodiscard]] std::unique_lock<std::mutex> Hold() { return std::unique_lock(m_mutex); }
    void Expect(const std::vector<ThumbnailTruth>& windows);      ///< Held.
    void Ask(const std::vector<unsigned>& ids) { m_asked = ids; } ///< Before the request; none is all.

    /// The request was cancelled, and the library has said so.
    void Forbid();
    /// False when there was neither a last call nor an error after PATIENCE.
    [[nodiscard]] bool IsDone() const { return m_done.Reaches(1); }

    ThumbnailFindings Findings() const;
    /// What the first foreign pixel was in; empty without one.
    std::string FirstLeak() const;

    bool onAppThumbnail(unsigned pid, ImageData image, bool failed, bool last) override;
    bool onWindowThumbnail(unsigned window, ImageData image, bool failed, bool last) override;
    bool onThumbnailError(int code) override;

private:
    struct Verdict {
        long foreign = 0;
        long shown = 0;
        unsigned firstForeign = 0;
    };
    using Candidates = std::vector<ThumbnailTruth>;
    using IsOfIt = std::function<bool(const ThumbnailTruth&)>;

    bool Take(const char* kind, unsigned id, const IsOfIt& isOfIt, const ImageData& image, bool failed,
              bool last);
    void Judge(const std::string& name, const Candidates& candidates, const ImageData& image, bool failed);
    static Verdict Compare(const ImageData& image, const ThumbnailTruth& truth);
    void NoteLeak(const std::string& text);

    const bool m_isHindered;
    const During m_during;
    std::vector<unsigned> m_asked;
    CTally m_done;
    mutable std::mutex m_mutex;
    // Guarded by m_mutex.
    Candidates m_truths;
    ThumbnailFindings m_findings;
    std::string m_firstLeak;
    bool m_isForbidden = false;
    int m_calls = 0;
};
