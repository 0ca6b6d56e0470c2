// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/x11/child_process.h"

#include <sys/types.h>
#include <xcb/xcb.h>

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

/// X servers and what runs on them, for tests: each is started by the test that needs it, under numbers that
/// no other test uses, and ends with it, also when the test crashes. Runs as root and as anybody else, and
/// needs no console.

/// What a test has to say when it can't run: the first of the programs that is missing. Where the packages
/// are known to be installed (CI=true) a missing one is a failure, and this throws.
std::optional<std::string> MissingProgram(const std::vector<std::string>& programs);

struct XServerOptions {
    enum class Kind {
        Xvfb,
        Xorg, ///< With the dummy driver: up to 16 outputs that can be plugged in and out.
    };

    Kind kind = Kind::Xvfb;
    int width = 1280; ///< Of Xorg: of its first output; the desktop can grow to 3840 x 2160.
    int height = 720;
    int depth = 24;
    std::vector<std::string> arguments{};
};

/// An X server. Not a member of the operations below fails silently: they throw std::runtime_error with the
/// end of the server's log.
class XServer {
public:
    using Kind = XServerOptions::Kind;

    explicit XServer(XServerOptions options = {});
    ~XServer();
    XServer(const XServer&) = delete;
    XServer& operator=(const XServer&) = delete;

    static std::vector<std::string> ProgramsOf(Kind kind);

    /// As in the variable DISPLAY; the same for the life of this object.
    std::string Display() const { return ":" + std::to_string(m_number); }
    int Number() const { return m_number; }
    const XServerOptions& Options() const { return m_options; }
    pid_t Pid() const { return m_process ? m_process->Pid() : 0; }
    bool IsRunning() const { return m_process != nullptr; }
    const CScratchFolder& Folder() const { return m_folder; }

    void Kill(); ///< At once, as by a crash. Its socket stays behind, as it does then.
    void Stop(); ///< Alive and deaf.
    void Continue();
    /// After Kill: another one of the same kind, on the same number.
    void Restart();

private:
    std::vector<std::string> Command(int readyDescriptor) const;
    void WriteConfiguration() const;
    bool Launch();
    void RemoveTraces() const;
    void Reserve();

    const XServerOptions m_options;
    CScratchFolder m_folder;
    int m_number = -1;
    int m_reservation = -1; // keeps other tests from the number, also while no server runs
    bool m_stopped = false;
    std::unique_ptr<CChildProcess> m_process;
};

/// A connection of the test's own, for looking at a server past what is tested.
class XLink {
public:
    explicit XLink(const std::string& display);
    ~XLink();
    XLink(const XLink&) = delete;
    XLink& operator=(const XLink&) = delete;

    xcb_connection_t* Get() const { return m_connection; }
    xcb_window_t Root() const { return m_screen != nullptr ? m_screen->root : 0U; }
    const xcb_screen_t& Screen() const { return *m_screen; }
    bool Works() const { return m_screen != nullptr && xcb_connection_has_error(m_connection) == 0; }

    xcb_atom_t Atom(const std::string& name) const;
    xcb_window_t OwnerOf(const std::string& selection) const;
    /// The 32-bit values of a property, as many as 1024.
    std::vector<std::uint32_t> Property(xcb_window_t window, const std::string& name) const;
    /// Asks the window manager, which answers once it has done all that it was asked before.
    void AskForFrame(xcb_window_t window) const;
    bool HasAnswered(xcb_window_t window) const;
    /// Comes back when the server has done all that was asked here before.
    void RoundTrip() const;

private:
    xcb_connection_t* const m_connection;
    xcb_screen_t* m_screen = nullptr;
};

/// A program on a server: a window manager, a compositor, a panel, anything. Throws when it doesn't get
/// ready.
class XProgram {
public:
    using Ready = std::function<bool(const XLink& link)>;

    XProgram(const XServer& server, const std::vector<std::string>& command, const Ready& ready = {});
    XProgram(const XProgram&) = delete;
    XProgram& operator=(const XProgram&) = delete;

    pid_t Pid() const { return m_process.Pid(); }

    /// Runs a program to its end; false when that wasn't a good one.
    static bool Run(const XServer& server, const std::vector<std::string>& command);
    static std::unique_ptr<XProgram> Openbox(const XServer& server);
    static std::unique_ptr<XProgram> Picom(const XServer& server); ///< Without fades and shadows.
    static std::unique_ptr<XProgram> Mutter(const XServer& server);
    static std::unique_ptr<XProgram> Tint2(const XServer& server); ///< A panel at the bottom edge.

private:
    CScratchFolder m_folder; // its home
    CChildProcess m_process;
};

/// Whether it comes to pass in time.
bool ComesTrue(const std::function<bool()>& condition,
               std::chrono::milliseconds limit = std::chrono::seconds(30));
