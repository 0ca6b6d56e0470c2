// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/privacy/x11/marker.h"

#include <screenshare/share_capture_engine.h>
#include <screenshare/share_frame.h>

#include <sys/types.h>

#include <array>
#include <chrono>
#include <cstddef>
#include <deque>
#include <filesystem>
#include <map>
#include <mutex>
#include <set>
#include <string>
#include <utility>
#include <vector>

inline constexpr std::array PRIVACY_MODES{SCREEN_CAPTURER_TYPE_DEFAULT, SCREEN_CAPTURER_TYPE_AVFOUNDATION,
                                          SCREEN_CAPTURER_TYPE_CGS_GCD,
                                          SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX};
inline constexpr std::array PRIVACY_KINDS{SHARE_CAPTURE_ENGINE_TYPE_DESKTOP, SHARE_CAPTURE_ENGINE_TYPE_APP,
                                          SHARE_CAPTURE_ENGINE_TYPE_WINDOW};

const char* NameOf(SHARE_CAPTURE_ENGINE_TYPE kind);

/// What came of one kind of share in one mode.
struct PrivacyTally {
    long frames = 0;    ///< Judged.
    long letIn = 0;     ///< Not judged: a secret was let in.
    long letInSeen = 0; ///< Of these, those that show it.
    long alive = 0;     ///< Of those judged, those that show somebody who may be seen,
    long terminal = 0;  ///< and whom.
    long toolkit = 0;
    long browser = 0;
    long menu = 0;
    long onScreen = 0;  ///< Of those judged, those with a secret on the screen, where it was captured.
    long leaks = 0;     ///< Of those judged, and of thumbnails, those with forbidden pixels,
    long forbidden = 0; ///< and how many these were.
    long through = 0;   ///< Pixels where the screen shows them in somebody who may be seen.
    long nearEdges = 0; ///< Pixels with some magenta that are neither.
    std::chrono::milliseconds longestExposure{0};
    long thumbnails = 0; ///< Of windows, or of applications, that may be seen.
    long thumbnailsAlive = 0;
};

/// All that a run has seen.
/// Threads: any.
class PrivacyJournal {
public:
    using Clock = std::chrono::steady_clock;

    /// Pictures of what should not have been seen go into `folder`.
    PrivacyJournal(unsigned seed, std::filesystem::path folder);

    // ---- What happens on the desktop

    /// `action` is printed with a leak that comes soon after it.
    void Note(const std::string& action);
    /// In which part of the run it is, for the lines.
    void SetPart(const std::string& part);
    void AddSecret(pid_t pid);
    void AddShown(pid_t pid); ///< Who may be seen.
    bool IsSecret(pid_t pid) const;
    bool IsShown(pid_t pid) const;

    // ---- What is delivered

    struct Delivery {
        SHARE_CAPTURE_ENGINE_TYPE kind;
        SCREEN_CAPTURER_TYPE mode;
        MarkerCount seen;
        bool isJudged;
        bool hasSecretOnScreen;
    };
    /// Modes 1 and 8 don't fetch what is kept out, so there mustn't be a trace of it. The others paint it
    /// over in pictures of the screen, which may be scaled: beside its edges there may be, and where somebody
    /// who may be seen hasn't painted yet, the screen itself shows what was there before.
    static long ForbiddenOf(SCREEN_CAPTURER_TYPE mode, const MarkerCount& seen);
    void Take(const Delivery& delivery, IShareFrame& frame);
    /// How long something forbidden has been seen by now, from the first frame of it.
    void TakeExposure(SHARE_CAPTURE_ENGINE_TYPE kind, SCREEN_CAPTURER_TYPE mode,
                      std::chrono::milliseconds time);
    /// An application's, or a window's, in a turn of that mode.
    void TakeThumbnail(SHARE_CAPTURE_ENGINE_TYPE kind, SCREEN_CAPTURER_TYPE mode, const MarkerCount& seen);
    /// Of a secret: how much of it is magenta tells that magenta can be seen at all.
    void TakeSecretThumbnail(const std::string& whose, const MarkerCount& seen);
    void CountFallback(SCREEN_CAPTURER_TYPE mode);
    /// Something is broken that has nothing to do with pixels.
    void Fail(const std::string& what);

    // ---- What came of it

    PrivacyTally Tally(SHARE_CAPTURE_ENGINE_TYPE kind, SCREEN_CAPTURER_TYPE mode) const;
    PrivacyTally Sum() const;
    /// The largest part of a thumbnail of such a secret that was magenta; 0 for none.
    double MostOfSecret(const std::string& whose) const;
    std::string Table() const;
    std::vector<std::string> Failures() const;
    std::string Progress() const;

private:
    using Key = std::pair<SCREEN_CAPTURER_TYPE, SHARE_CAPTURE_ENGINE_TYPE>;

    void KeepExample(const Delivery& delivery, IShareFrame& frame);
    void TellLeak(const Delivery& delivery, IShareFrame& frame, long number);
    double Second() const;
    static std::string Row(const Key& key, const PrivacyTally& tally);

    const unsigned m_seed;
    const std::filesystem::path m_folder;
    const Clock::time_point m_start = Clock::now();

    mutable std::mutex m_mutex;
    // Guarded by m_mutex.
    std::string m_part;
    std::deque<std::string> m_actions;
    std::set<pid_t> m_secrets;
    std::set<pid_t> m_shown;
    std::map<Key, PrivacyTally> m_tallies;
    std::map<SCREEN_CAPTURER_TYPE, long> m_fallbacks;
    std::map<std::string, double> m_mostOfSecret;
    std::vector<std::string> m_failures;
    std::set<Key> m_examples;
    int m_pictures = 0;
};
