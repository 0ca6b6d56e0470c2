// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "bench/meter/statistics.h"

#include <sys/types.h>

#include <functional>
#include <map>
#include <string>
#include <vector>

/// What looking at a desktop costs: CPU milliseconds a tick, of who looks and of the X server.

/// A tick is a thirtieth of a second, whether a frame came or not.
constexpr int TICKS_PER_SECOND = 30;

struct Cost {
    double client = 0;
    double server = 0;
    double framesPerSecond = 0;
    std::map<std::string, double> clientByThread;
};

/// Who looks: its process (0 for nobody), and how many frames it has had so far. Without `frames` they aren't
/// counted.
struct Onlooker {
    pid_t pid = 0;
    std::function<int()> frames;
};

/// Waits for that long and tells what was spent meanwhile.
Cost MeasureCost(const Onlooker& onlooker, pid_t server, double seconds);

/// The costs of repeated measurements.
struct Costs {
    std::vector<double> client;
    std::vector<double> server; ///< Without the scene's own.
    std::vector<double> total;
    std::vector<double> framesPerSecond;
    std::map<std::string, std::vector<double>> clientByThread;

    /// `sceneAlone` is what the server spends on the scene when nobody looks. `share` of the ticks had a
    /// frame: what was spent is divided by that, or missing frames would look like savings.
    void Add(const Cost& cost, double sceneAlone, double share = 1);
};
