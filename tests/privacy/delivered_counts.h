// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/privacy/privacy_oracle.h"
#include "tests/privacy/thumbnail_judge.h"

#include <screenshare/share_engine.h>

#include <chrono>
#include <ostream>
#include <string>

/// What is shared, and how it is captured.
struct DeliveredKind {
    const char* name;
    SHARE_CAPTURE_ENGINE_TYPE engine;
    SCREEN_CAPTURER_TYPE mode;
    /// Made of pictures of the windows that may be seen and nothing else: not even an edge shows any red.
    bool isOfWindowPictures;

    bool IsOfDesktop() const { return engine == SHARE_CAPTURE_ENGINE_TYPE_DESKTOP; }
    bool IsOfApplications() const { return engine == SHARE_CAPTURE_ENGINE_TYPE_APP; }
    bool IsOfWindows() const { return engine == SHARE_CAPTURE_ENGINE_TYPE_WINDOW; }
    /// Its frames come later than they are taken.
    bool IsQueued() const { return mode == SCREEN_CAPTURER_TYPE_CGS_GCD; }
    /// Its frames are masked samples of a capture session.
    bool IsOfSession() const {
        return mode == SCREEN_CAPTURER_TYPE_AVFOUNDATION || mode == SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX;
    }
};

inline void PrintTo(const DeliveredKind& kind, std::ostream* out) {
    *out << kind.name;
}

inline constexpr DeliveredKind DELIVERED_KINDS[] = {
    {"DesktopByDefault", SHARE_CAPTURE_ENGINE_TYPE_DESKTOP, SCREEN_CAPTURER_TYPE_DEFAULT, true},
    {"DesktopQueued", SHARE_CAPTURE_ENGINE_TYPE_DESKTOP, SCREEN_CAPTURER_TYPE_CGS_GCD, true},
    {"ApplicationByDefault", SHARE_CAPTURE_ENGINE_TYPE_APP, SCREEN_CAPTURER_TYPE_DEFAULT, true},
    {"ApplicationQueued", SHARE_CAPTURE_ENGINE_TYPE_APP, SCREEN_CAPTURER_TYPE_CGS_GCD, true},
    {"WindowByDefault", SHARE_CAPTURE_ENGINE_TYPE_WINDOW, SCREEN_CAPTURER_TYPE_DEFAULT, true},
    {"WindowQueued", SHARE_CAPTURE_ENGINE_TYPE_WINDOW, SCREEN_CAPTURER_TYPE_CGS_GCD, true},
};

inline constexpr DeliveredKind DELIVERED_SESSION_KINDS[] = {
    {"DesktopBySession", SHARE_CAPTURE_ENGINE_TYPE_DESKTOP, SCREEN_CAPTURER_TYPE_AVFOUNDATION, false},
    {"DesktopByMix", SHARE_CAPTURE_ENGINE_TYPE_DESKTOP, SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX, false},
    {"ApplicationBySession", SHARE_CAPTURE_ENGINE_TYPE_APP, SCREEN_CAPTURER_TYPE_AVFOUNDATION, false},
    {"ApplicationByMix", SHARE_CAPTURE_ENGINE_TYPE_APP, SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX, false},
    {"WindowBySession", SHARE_CAPTURE_ENGINE_TYPE_WINDOW, SCREEN_CAPTURER_TYPE_AVFOUNDATION, false},
    {"WindowByMix", SHARE_CAPTURE_ENGINE_TYPE_WINDOW, SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX, false},
};

struct DeliveredCounts {
    PrivacyFindings findings;
    long frames = 0;
    long resent = 0;
    /// Those sent again whose size had become another one meanwhile. They are not judged.
    long reshaped = 0;
    /// Those, new or sent again, that were taken before something was kept out that they may show.
    long ofBefore = 0;
    /// Those that were taken when no frame was.
    long ofNoMoment = 0;
    /// How often the engine gave the mode up because captures kept failing.
    long givenUp = 0;

    // Life: pixels of kept windows, as if nothing else were there, of frames that nothing disturbed.
    long framesForLife = 0;
    long keptThere = 0;
    long keptShown = 0;
    /// Pixels of those frames that show something where nothing is that may be seen.
    long strange = 0;

    ThumbnailFindings thumbnails;

    /// From the first frame that shows what it must not to the next one that doesn't, on the desktop's clock.
    std::chrono::milliseconds longestExposure{0};

    /// The first frame or thumbnail that shows what it must not, or not what it may, for whoever has to find
    /// out why.
    std::string firstLeak;

    long Red() const {
        return findings.leaks + findings.redNearEdges + findings.redThroughKept + findings.redElsewhere;
    }
    DeliveredCounts& operator+=(const DeliveredCounts& other);
};

/// One line for a log.
std::string ToString(const DeliveredCounts& counts);

/// Whether something was shown that must not be.
bool IsLeak(const DeliveredKind& kind, const DeliveredCounts& counts);

/// Whether too little was shown of what may be.
bool IsDead(const DeliveredKind& kind, const DeliveredCounts& counts);
