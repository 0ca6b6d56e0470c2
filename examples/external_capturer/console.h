// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_engine.h>

#include <chrono>
#include <string>

/// The wait of the main thread, while the engine's threads do the work: for commands, signals and the end.
class Console {
public:
    /// Blocks SIGINT and SIGTERM in this thread and those it starts from now on, to read them as input
    /// instead.
    Console();
    ~Console();
    Console(const Console&) = delete;
    Console& operator=(const Console&) = delete;

    /// Returns when `stop` was typed, a signal came, `endFd` got readable or the time is over (0: never).
    void Run(IShareCaptureEngine& engine, int endFd, std::chrono::seconds limit);

private:
    bool ReadCommands(IShareCaptureEngine& engine);
    bool RunLines(IShareCaptureEngine& engine);

    const int m_signalFd;
    bool m_inputOpen = true;
    std::string m_input; // Read and not yet run: the beginning of a line.
};
