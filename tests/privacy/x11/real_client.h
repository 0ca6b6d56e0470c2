// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/x11/child_process.h"
#include "tests/x11/x11_rig.h"

#include <sys/types.h>

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

/// Programs as they are on everybody's desktop. Each of them is of one colour within its frame.

enum class RealKind {
    Terminal,
    Toolkit,
    Browser
};

const char* NameOf(RealKind kind);
/// What has to be installed for it: a program to look for, and the Debian packages that bring it.
std::string ProgramOf(RealKind kind);
std::vector<std::string> PackagesOf(RealKind kind);

/// Whether it can be started here.
bool IsInstalled(RealKind kind);

/// The files that such programs show and run, and their homes. One for all of them.
class RealClientFiles {
public:
    RealClientFiles();

    const CScratchFolder& Folder() const { return m_folder; }

private:
    CScratchFolder m_folder;
};

/// One of them, in a process of its own, from its start to its end.
/// Threads: one.
class RealClient {
public:
    struct Plan {
        RealKind kind = RealKind::Terminal;
        bool isSecret = false;
        int number = 0; ///< No other client of the run has it.
    };

    RealClient(const XServer& server, const RealClientFiles& files, const Plan& plan);

    RealKind Kind() const { return m_plan.kind; }
    bool IsSecret() const { return m_plan.isSecret; }
    int Number() const { return m_plan.number; }
    std::string Name() const;
    std::string Title() const; ///< Of its window, and of no other one of its.
    pid_t Pid() const { return m_program->Pid(); }
    /// Its kind also opens windows past the window manager, as menus are.
    bool HasPopups() const { return m_plan.kind == RealKind::Toolkit; }

    /// Looks for its window among those that the window manager lists. 0 before it is there, and when it is
    /// gone.
    void Look(const XLink& link, const std::vector<std::uint32_t>& listed);
    std::uint32_t Window() const { return m_window; }
    /// It had a window and has none any more.
    bool HasGone() const { return m_hadWindow && m_window == 0; }

private:
    const Plan m_plan;
    std::unique_ptr<XProgram> m_program;
    std::uint32_t m_window = 0;
    bool m_hadWindow = false;
};
