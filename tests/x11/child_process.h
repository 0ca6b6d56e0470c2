// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <sys/types.h>

#include <filesystem>
#include <string>
#include <utility>
#include <vector>

/// A folder of the test's own, away with all that is in it at the end of the scope.
class CScratchFolder {
public:
    CScratchFolder();
    ~CScratchFolder();
    CScratchFolder(const CScratchFolder&) = delete;
    CScratchFolder& operator=(const CScratchFolder&) = delete;

    const std::filesystem::path& Path() const { return m_path; }
    std::string File(const std::string& name) const { return (m_path / name).string(); }

private:
    std::filesystem::path m_path;
};

/// A process of ours, killed at the end of the scope at the latest. The kernel kills it too when the thread
/// that has started it ends, so start them on the test's own thread.
/// Threads: one at a time.
class CChildProcess {
public:
    struct Plan {
        std::vector<std::string> command;                             ///< The program is looked up in PATH.
        std::vector<std::pair<std::string, std::string>> environment; ///< Added to ours.
        std::string log; ///< Where its output goes; nowhere when empty.
        int input = -1;  ///< What it has as its standard input; nothing for -1.
        int output = -1; ///< Its standard output in place of the log.
        int keep = -1;   ///< A descriptor that it inherits under the same number.
    };

    explicit CChildProcess(const Plan& plan);
    ~CChildProcess();
    CChildProcess(const CChildProcess&) = delete;
    CChildProcess& operator=(const CChildProcess&) = delete;

    pid_t Pid() const { return m_pid; }
    bool IsRunning();
    /// To it alone, not to what it has started.
    void Signal(int number) const;
    /// Whether it has ended within the time.
    bool WaitForEnd(int milliseconds);
    /// Whether it has ended by itself, and well.
    bool HasSucceeded() const { return m_ended && m_status == 0; }
    /// Asks it to end, and kills it with all that it has started when it doesn't.
    void End();
    void Kill();

private:
    const pid_t m_pid;
    bool m_ended = false;
    int m_status = -1; // as waitpid tells it
};

/// The full path of a program; empty when it isn't installed.
std::string FindProgram(const std::string& name);
