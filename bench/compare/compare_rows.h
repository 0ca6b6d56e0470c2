// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "bench/compare/compare_peers.h"
#include "bench/compare/compare_table.h"
#include "bench/meter/scenes.h"
#include "bench/meter/x11_bench.h"

#include <exception>
#include <optional>
#include <string>
#include <vector>

/// Measures peers side by side on one X server and tells what was found. In each repeat the scene alone and
/// the peers take turns, so that all of them meet the same machine.
/// Errors: a row in which a peer fails, or shows something else than the scene, is told and left out.
class Comparison {
public:
    Comparison(const XServer& server, const BenchOptions& options, std::vector<Peer> peers,
               BenchResults& results);

    /// Shares of the screen, and of one window that another one covers.
    void RunShares();
    /// Of a covered window of 800x600.
    void RunSmallWindows();
    /// Cost against the part of the screen that changes.
    void RunChanges();
    /// Cost against the number of windows that stand still.
    void RunWindows();
    /// Several captures of one screen in a process.
    void RunCaptures();
    /// The time to list the windows.
    void RunLists();

    /// Whether no row has been left out so far.
    bool HasSucceeded() const { return m_succeeded; }

private:
    struct Plan {
        std::string row;
        Scene scene;
        Subject subject;
        std::vector<Peer> peers;
        std::optional<double> goal;
    };

    void Run(const Plan& plan);
    void Measure(Plan plan, const std::string& name);
    void Fail(const std::string& row, const std::exception& failure);
    Cost MeasureOne(const Plan& plan, PeerCosts& peer) const;
    void Verify(RunningPeer& peer, const Scene& scene) const;
    /// Ours and those configurations of WebRTC's that don't compare frames, which have never been the best.
    std::vector<Peer> Rivals() const;
    void ListAll(const std::string& row, int windows);
    void List(const Peer& peer, const std::string& row, int windows);
    void TellHeaderOnce();

    const XServer& m_server;
    const BenchOptions m_options;
    const std::vector<Peer> m_peers;
    BenchResults& m_results;
    bool m_headerTold = false;
    bool m_succeeded = true;
};
