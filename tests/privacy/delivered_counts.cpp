// SPDX-License-Identifier: Apache-2.0
#include "tests/privacy/delivered_counts.h"

#include <algorithm>

DeliveredCounts& DeliveredCounts::operator+=(const DeliveredCounts& other) {
    findings += other.findings;
    frames += other.frames;
    resent += other.resent;
    reshaped += other.reshaped;
    ofBefore += other.ofBefore;
    ofNoMoment += other.ofNoMoment;
    givenUp += other.givenUp;
    framesForLife += other.framesForLife;
    keptThere += other.keptThere;
    keptShown += other.keptShown;
    strange += other.strange;
    thumbnails += other.thumbnails;
    longestExposure = std::max(longestExposure, other.longestExposure);
    if (firstLeak.empty())
        firstLeak = other.firstLeak;
    return *this;
}

std::string ToString(const DeliveredCounts& counts) {
    return std::to_string(counts.frames) + " frames (" + std::to_string(counts.resent) + " sent again, " +
           std::to_string(counts.reshaped) + " of these in another size, " + std::to_string(counts.ofBefore) +
           " taken before something was kept out, " + std::to_string(counts.ofNoMoment) +
           " at no known moment, the mode given up " + std::to_string(counts.givenUp) +
           " times): " + ToString(counts.findings) + "; " + std::to_string(counts.framesForLife) +
           " undisturbed frames with " + std::to_string(counts.keptThere) + " pixels of what is kept, " +
           std::to_string(counts.keptShown) + " of them shown, and " + std::to_string(counts.strange) +
           " of what isn't there; " + ToString(counts.thumbnails) + "; longest exposure " +
           std::to_string(counts.longestExposure.count()) + " ms" + counts.firstLeak;
}

bool IsLeak(const DeliveredKind& kind, const DeliveredCounts& counts) {
    if (counts.ofBefore + counts.ofNoMoment > 0 || counts.thumbnails.IsLeak())
        return true;
    // A sample that is older than the list of what is kept out shows red where nothing red is any more.
    return kind.isOfWindowPictures ? counts.Red() + counts.strange > 0
                                   : counts.findings.leaks + counts.findings.redElsewhere > 0;
}

bool IsDead(const DeliveredKind& kind, const DeliveredCounts& counts) {
    // Samples are late, so of a session some pixels are those of before, and only many make a difference.
    constexpr int ENOUGH_FRAMES = 10;
    constexpr long PIXELS_OF_A_FRAME = 100;
    if (counts.thumbnails.IsDead())
        return true;
    if (!kind.IsOfSession())
        return counts.keptShown != counts.keptThere;
    return counts.framesForLife >= ENOUGH_FRAMES &&
           counts.keptThere > PIXELS_OF_A_FRAME * counts.framesForLife &&
           counts.keptShown < counts.keptThere / 10;
}
