// SPDX-License-Identifier: Apache-2.0
#include "bench/compare/compare_table.h"

#include <algorithm>
#include <cstdio>

namespace {

double MedianTotal(const PeerCosts& peer) {
    return SpreadOf(peer.costs.total).median;
}

void TellThreads(const PeerCosts& peer) {
    std::printf("    %s by thread:", peer.peer.name.c_str());
    for (const auto& [thread, times] : peer.costs.clientByThread)
        std::printf(" %s %.3f", thread.c_str(), SpreadOf(times).median);
    std::printf("\n");
}

void TellPeer(const ComparedRow& row, const PeerCosts& peer, const PeerCosts* best, BenchResults& results) {
    const Spread total = SpreadOf(peer.costs.total);
    const double client = SpreadOf(peer.costs.client).median;
    const double server = SpreadOf(peer.costs.server).median;
    const double rate = SpreadOf(peer.costs.framesPerSecond).median;
    BenchResults::Values values{{"client_ms", client},
                                {"server_ms", server},
                                {"total_ms", total.median},
                                {"total_ms_lowest", total.lowest},
                                {"total_ms_highest", total.highest},
                                {"frames_per_second", rate},
                                {"peak_megabytes", peer.peakMegabytes},
                                {"repeats", static_cast<double>(peer.costs.total.size())}};
    std::printf("  %-22s %8.3f %8.3f %8.3f [%7.3f ..%7.3f] %5.1f %7.1f", peer.peer.name.c_str(), client,
                server, total.median, total.lowest, total.highest, rate, peer.peakMegabytes);
    if (best != nullptr) {
        const Spread ratio = RatioOf(peer.costs, best->costs);
        values.insert(
            values.end(),
            {{"ratio", ratio.median}, {"ratio_lowest", ratio.lowest}, {"ratio_highest", ratio.highest}});
        std::printf(" %6.2f [%5.2f ..%5.2f]", ratio.median, ratio.lowest, ratio.highest);
    }
    if (best != nullptr && row.goal && &peer == &row.peers.front()) {
        values.emplace_back("goal", *row.goal);
        std::printf("  goal %.2f %s", *row.goal,
                    RatioOf(peer.costs, best->costs).median <= *row.goal ? "met" : "missed");
    }
    std::printf("\n");
    results.Add(row.name + "/" + peer.peer.name, values);
}

} // namespace

const PeerCosts* BestWebrtc(const ComparedRow& row) {
    const PeerCosts* best = nullptr;
    for (const PeerCosts& each : row.peers) {
        if (IsWebrtc(each.peer) && (best == nullptr || MedianTotal(each) < MedianTotal(*best)))
            best = &each;
    }
    return best;
}

Spread RatioOf(const Costs& costs, const Costs& other) {
    std::vector<double> ratios;
    for (std::size_t i = 0; i < costs.total.size(); ++i)
        ratios.push_back(costs.total[i] / other.total[i]);
    Spread ratio = SpreadOf(ratios);
    ratio.median = SpreadOf(costs.total).median / SpreadOf(other.total).median;
    ratio.lowest = std::min(ratio.lowest, ratio.median);
    ratio.highest = std::max(ratio.highest, ratio.median);
    return ratio;
}

void TellCostsHeader() {
    std::printf(
        "\nCPU ms a tick at 30 ticks a second with a frame each: medians of the repeats [lowest .. highest]. Ratios are "
        "to WebRTC's best\nconfiguration in the same row.\n  %-22s %8s %8s %8s %19s %5s %7s %6s\n",
        "", "client", "server", "total", "", "fps", "peak MB", "ratio");
}

void TellRow(const ComparedRow& row, BenchResults& results) {
    const Spread alone = SpreadOf(row.sceneAlone);
    std::printf("%s (the scene alone: %.3f [%.3f .. %.3f] in the server; the median is taken off)\n",
                row.name.c_str(), alone.median, alone.lowest, alone.highest);
    const PeerCosts* const best = BestWebrtc(row);
    for (const PeerCosts& peer : row.peers)
        TellPeer(row, peer, best, results);
    TellThreads(row.peers.front());
    std::fflush(stdout);
}
