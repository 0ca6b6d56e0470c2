// SPDX-License-Identifier: Apache-2.0
#include "bench/compare/compare_peers.h"
#include "bench/compare/compare_rows.h"
#include "bench/meter/scenes.h"
#include "bench/meter/x11_bench.h"

#include <signal.h>

#include <cstdio>
#include <cstdlib>
#include <exception>
#include <memory>
#include <stdexcept>

/// What this library costs beside what a user would pick instead: shares of a screen of 1920x1080 and of one
/// covered window, thirty frames a second with the pointer in them, by scene; then what grows with what.

namespace {

/// Whether nothing has failed; a machine that can't run the server is no failure.
bool RunOn(XServerOptions::Kind kind, const BenchOptions& options, BenchResults& results) {
    const std::unique_ptr<XServer> server = StartBenchServer(kind);
    if (server == nullptr)
        return true;
    Comparison comparison(*server, options, FindPeers(), results);
    comparison.RunShares();
    comparison.RunSmallWindows();
    comparison.RunChanges();
    comparison.RunWindows();
    comparison.RunCaptures();
    comparison.RunLists();
    return comparison.HasSucceeded();
}

} // namespace

int main(int argc, char** argv) {
    if (const auto played = PlaySceneIfAsked(argc, argv))
        return *played;
    signal(SIGPIPE, SIG_IGN); // a driver that has ended is told, and no reason to end
    try {
        const BenchOptions options = ReadBenchOptions(argc, argv);
        BenchResults results;
        if (options.servers.size() != 1)
            throw std::invalid_argument("rows don't tell servers apart: compare on one of them");
        const bool succeeded = RunOn(options.servers.front(), options, results);
        const bool written = options.out.empty() || results.Write(options.out);
        return succeeded && written ? EXIT_SUCCESS : EXIT_FAILURE;
    } catch (const std::exception& failure) {
        std::fprintf(stderr, "compare_bench: %s\n", failure.what());
        return EXIT_FAILURE;
    }
}
