// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "bench/compare/compare_peers.h"
#include "bench/meter/share_cost.h"
#include "bench/meter/statistics.h"
#include "bench/meter/x11_bench.h"

#include <optional>
#include <string>
#include <vector>

/// What was measured of the peers in one row, and how it is told.

struct PeerCosts {
    Peer peer;
    Costs costs;
    double peakMegabytes = 0;
};

struct ComparedRow {
    std::string name;
    std::vector<PeerCosts> peers; ///< Ours first.
    std::vector<double> sceneAlone;
    std::optional<double> goal; ///< Of our ratio.
};

/// The configuration of WebRTC's capturer with the lowest median total; null without one.
const PeerCosts* BestWebrtc(const ComparedRow& row);
/// Of a peer's total to another's, repeat by repeat; the median is that of the medians. Both have been
/// repeated as often.
Spread RatioOf(const Costs& costs, const Costs& other);

void TellCostsHeader();
/// On the standard output, and to `results`.
void TellRow(const ComparedRow& row, BenchResults& results);
