// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/x11/x11_rig.h"

#include <sys/types.h>

#include <cstddef>
#include <cstdint>
#include <map>
#include <string>
#include <vector>

/// What a process holds, and what an X server holds for it.

/// By name: "heap KiB" (in use), "resident KiB", "descriptors", "threads", "shared mappings", "server KiB"
/// (resident), "X pixmap KiB", and "X " with a type of resource for each that the server counts for
/// connections of this process.
using SoakFigures = std::map<std::string, double>;

/// The server's side, by the extension X-Resource and a connection that isn't counted itself.
/// Threads: one at a time.
class SoakServerMeter {
public:
    /// Throws when the server can't tell.
    explicit SoakServerMeter(const XServer& server);

    void Read(SoakFigures& figures);

private:
    std::vector<std::uint32_t> OwnConnections() const;
    void CountResources(std::uint32_t connection, SoakFigures& figures);
    double PixmapBytes(std::uint32_t connection) const;
    const std::string& NameOf(xcb_atom_t type);

    const pid_t m_server;
    const XLink m_link;
    std::map<xcb_atom_t, std::string> m_names;
};

class SoakMeter {
public:
    SoakMeter(const XServer& server, std::size_t samples);

    SoakFigures Read();
    /// Reads, and keeps it.
    const SoakFigures& Sample();

    /// All of one length, whenever their counter was seen for the first time.
    const std::map<std::string, std::vector<double>>& Samples() const { return m_samples; }

    /// How much a counter may rise within the second half of a run. What fluctuates by itself, such as what
    /// the allocator keeps, needs some room; a leak that comes with frames, calls or windows has exceeded it
    /// long before.
    static double AllowedGrowth(const std::string& counter);

private:
    const std::size_t m_room;
    std::size_t m_taken = 0;
    SoakServerMeter m_server;
    SoakFigures m_last;
    std::map<std::string, std::vector<double>> m_samples;
};

/// Counters that have more than at that time and should not: "threads: 12 and not 9".
std::vector<std::string> LeftOver(const SoakFigures& before, const SoakFigures& after);
