// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/privacy/x11/real_client.h"
#include "tests/privacy/x11/window_wishes.h"
#include "tests/x11/x11_client_driver.h"
#include "tests/x11/x11_outputs.h"
#include "tests/x11/x11_rig.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

/// A desktop of two monitors with a window manager and, when it is wanted, a compositor, on an X server of
/// its own, where people's programs run: of each kind that is installed one that may be seen and a secret
/// one. Threads: one.
class RealDesk {
public:
    // Sizes that every dummy driver knows.
    static constexpr int WIDTH = 960;
    static constexpr int HEIGHT = 540;
    static constexpr int SIDE_WIDTH = 640;
    static constexpr int SIDE_HEIGHT = 480;

    RealDesk();

    /// Without which there is no desktop.
    static std::vector<std::string> Programs();
    static bool HasPicom() { return !FindProgram("picom").empty(); }

    const XServer& Server() const { return m_server; }
    const WindowWishes& Wishes() const { return m_wishes; }
    const std::vector<RealKind>& Kinds() const { return m_kinds; }
    /// What of this isn't installed, in words.
    const std::vector<std::string>& Missing() const { return m_missing; }

    void SetComposited(bool isComposited);

    // ---- Monitors

    bool HasSide() const { return m_side.has_value(); }
    void PlugSide(bool isOn);
    void ResizeMain(bool isSmall);

    // ---- Programs

    using Clients = std::vector<std::unique_ptr<RealClient>>;
    Clients& All() { return m_clients; }
    RealClient& Start(RealKind kind, bool isSecret);
    /// Kills it, if it hasn't ended.
    void End(const RealClient& client);
    /// Finds windows that have come and gone.
    void Look();

    /// Draw menus: one may be seen, the other may not.
    X11Client& Menus(bool isSecret) { return isSecret ? m_secretMenus : m_shownMenus; }

private:
    static XServerOptions ServerOptions();

    XServer m_server{ServerOptions()};
    X11Outputs m_outputs{m_server};
    std::unique_ptr<XProgram> m_manager{XProgram::Openbox(m_server)};
    std::unique_ptr<XProgram> m_compositor;
    std::optional<std::string> m_side; // its output
    const RealClientFiles m_files;
    XLink m_link{m_server.Display()};
    const WindowWishes m_wishes{m_link};
    X11Client m_shownMenus{m_server, "menus"};
    X11Client m_secretMenus{m_server, "secrets"};
    std::vector<RealKind> m_kinds;
    std::vector<std::string> m_missing;
    Clients m_clients;
    int m_started = 0;
};
