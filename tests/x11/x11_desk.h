// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/x11/x11_window_server.h"
#include "tests/platform/conformance_desk.h"
#include "tests/x11/x11_client_driver.h"
#include "tests/x11/x11_outputs.h"
#include "tests/x11/x11_rig.h"

#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

/// What runs on an X server of the tests.
struct X11DeskOptions {
    enum class Manager {
        None,
        Openbox,
        Mutter, ///< A compositor as well.
    };

    XServerOptions server;
    Manager manager = Manager::None;
    bool picom = false;
    bool tint2 = false;

    std::vector<std::string> Programs() const;
};

/// A real X desktop: a server of its own, with a window manager or without one, and applications that are
/// processes of their own.
class X11Desk final : public ConformanceDesk {
public:
    explicit X11Desk(X11DeskOptions options);
    ~X11Desk() override;

    platform::WindowServer& Server() override { return *m_server; }
    std::shared_ptr<platform::WindowServer> Release() override { return std::move(m_server); }

    void Settle() override;

    std::optional<pid_t> StartApplication(const std::string& name) override;
    bool EndApplication(pid_t pid) override;

    std::optional<platform::CGWindowID> AddWindow(pid_t owner, const platform::CGRect& frame,
                                                  std::uint32_t rgb) override;
    bool Close(platform::CGWindowID id) override;
    bool SetFrame(platform::CGWindowID id, const platform::CGRect& frame) override;
    bool Raise(platform::CGWindowID id) override { return Tell("raise", id); }
    bool Minimise(platform::CGWindowID id) override;
    bool Restore(platform::CGWindowID id) override;
    bool Recolour(platform::CGWindowID id, std::uint32_t rgb) override;
    bool SetAlpha(platform::CGWindowID id, float alpha) override;
    bool Float(platform::CGWindowID id) override;
    bool SetTitle(platform::CGWindowID id, const std::string& title) override;

    std::optional<platform::CGDirectDisplayID> AddDisplay(const platform::CGSize& size) override;
    bool Unplug(platform::CGDirectDisplayID id) override;
    bool PlugInAgain(platform::CGDirectDisplayID id) override;
    bool Resize(platform::CGDirectDisplayID id, const platform::CGSize& size) override;
    bool MakeMain(platform::CGDirectDisplayID id) override;
    bool ReserveTop(platform::CGDirectDisplayID id, float points) override;

    bool MovePointer(const platform::CGPoint& position) override;
    bool ChangeCursor() override;

    bool Stall() override;
    bool Answer() override;
    bool Lose() override;
    bool FindAgain() override;

    // ---- For tests of X11 alone

    XServer& Rig() { return m_rig; }
    /// As a client does it: nobody is told.
    bool WarpPointer(const platform::CGPoint& position);
    /// Null when there is none of that pid.
    X11Client* Application(pid_t pid);
    /// The one that AddWindow has made, as its application calls it.
    std::string NameOf(platform::CGWindowID id) const;

private:
    struct Window {
        pid_t owner = 0;
        std::string name;
    };

    bool Composited() const {
        return m_options.picom || m_options.manager == X11DeskOptions::Manager::Mutter;
    }
    bool Managed() const { return m_options.manager != X11DeskOptions::Manager::None; }
    std::string OutputOf(platform::CGDirectDisplayID id) const;
    void StartPrograms();
    void MakeMarker();
    void WaitForManager();
    bool Tell(const std::string& command, platform::CGWindowID window, const std::string& rest = {});

    const X11DeskOptions m_options;
    XServer m_rig;
    X11Outputs m_outputs{m_rig};
    std::unique_ptr<XProgram> m_manager;
    std::unique_ptr<XProgram> m_compositor;
    std::unique_ptr<XProgram> m_panel;
    std::unique_ptr<XLink> m_link;
    // Of m_link.
    xcb_window_t m_marker = 0;   // its title tells how far the server has got
    xcb_window_t m_question = 0; // asks how far the window manager has; never mapped, or some don't answer
    xcb_window_t m_glass = 0;    // of m_link; has a cursor, and is mapped once one is wanted
    bool m_deaf = false;
    std::map<pid_t, std::unique_ptr<X11Client>> m_applications;
    std::map<platform::CGWindowID, Window> m_windows;
    std::map<platform::CGDirectDisplayID, std::string> m_displays; // outputs; the first one isn't here
    int m_counter = 0;
    std::shared_ptr<platform::WindowServer> m_server;
};
