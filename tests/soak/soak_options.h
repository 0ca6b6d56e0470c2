// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <string>

/// What a run loses on purpose, with each sample, to show that it would be noticed.
enum class SoakLoss {
    Nothing,
    Memory,
    Descriptor,
    Thread,
    Resource, ///< Of the X server.
};

struct SoakOptions {
    std::chrono::milliseconds duration{std::chrono::minutes(3)}; ///< Without the warm-up.
    std::chrono::milliseconds interval{1000};                    ///< From sample to sample.
    std::chrono::milliseconds warmUp{std::chrono::seconds(10)};
    int width = 640; ///< Of each of the two monitors.
    int height = 480;
    unsigned framesPerSecond = 30;
    unsigned seed = 20261122;
    std::string json; ///< A file for the results; none when empty.
    SoakLoss loss = SoakLoss::Nothing;

    std::size_t Samples() const { return static_cast<std::size_t>(duration / interval); }
};

/// Understands --seconds=, --interval= (ms), --warm-up= (ms), --size=WxH, --fps=, --seed=, --json= and
/// --lose=memory|descriptor|thread|resource. Throws std::invalid_argument for anything else, and for a run
/// that is too short to be judged.
SoakOptions ReadSoakOptions(int count, const char* const* arguments);
