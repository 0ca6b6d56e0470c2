// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/x11/x11_rig.h"

#include <memory>
#include <string>
#include <utility>
#include <vector>

/// What the benchmarks on X11 have in common: their options, their servers and their results.

struct BenchOptions {
    std::string filter = "."; ///< A regular expression; only rows whose names hold a match are measured.
    std::string out;          ///< A file for the results as JSON; none when empty.
    double seconds = 3;       ///< How long each measurement of a share takes.
    int repeats = 5;
    std::vector<XServerOptions::Kind> servers{XServerOptions::Kind::Xvfb};

    bool Wants(const std::string& row) const;
};

/// Understands --benchmark_filter= and --benchmark_out= as the other benchmarks do and passes over the rest
/// of theirs; its own are --seconds=, --repeats= and --server=xvfb|xorg|both. Throws std::invalid_argument
/// for one that it can't read.
BenchOptions ReadBenchOptions(int argc, const char* const* argv);

/// A server of 1920x1080 that ends with it; null, after a line that says why, when there can't be one.
std::unique_ptr<XServer> StartBenchServer(XServerOptions::Kind kind);
std::string NameOf(XServerOptions::Kind kind);

/// Named numbers, row by row.
class BenchResults {
public:
    using Values = std::vector<std::pair<std::string, double>>;

    void Add(std::string row, Values values) { m_rows.emplace_back(std::move(row), std::move(values)); }
    /// In the outer form of the other benchmarks' files. False when it can't be written.
    bool Write(const std::string& file) const;

private:
    std::vector<std::pair<std::string, Values>> m_rows;
};
