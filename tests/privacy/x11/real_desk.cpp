// SPDX-License-Identifier: Apache-2.0
#include "tests/privacy/x11/real_desk.h"

#include <algorithm>
#include <filesystem>

namespace {

XServer::Kind KindOfServer() {
    const bool hasOutputs = !FindProgram(XServer::ProgramsOf(XServer::Kind::Xorg)[0]).empty() &&
                            std::filesystem::exists("/usr/lib/xorg/modules/drivers/dummy_drv.so") &&
                            !FindProgram("xrandr").empty();
    return hasOutputs ? XServer::Kind::Xorg : XServer::Kind::Xvfb;
}

} // namespace

XServerOptions RealDesk::ServerOptions() {
    XServerOptions options;
    options.kind = KindOfServer();
    options.width = WIDTH;
    options.height = HEIGHT;
    return options;
}

std::vector<std::string> RealDesk::Programs() {
    std::vector<std::string> programs = XServer::ProgramsOf(XServer::Kind::Xvfb);
    programs.emplace_back("openbox");
    programs.emplace_back(ProgramOf(RealKind::Terminal));
    return programs;
}

RealDesk::RealDesk() {
    for (const RealKind kind : {RealKind::Terminal, RealKind::Toolkit, RealKind::Browser}) {
        if (IsInstalled(kind)) {
            m_kinds.push_back(kind);
            continue;
        }
        std::string line = std::string(NameOf(kind)) + " (packages:";
        for (const std::string& package : PackagesOf(kind))
            line += " " + package;
        m_missing.push_back(line + ")");
    }
    if (!HasPicom())
        m_missing.emplace_back("a compositor (package: picom)");
    m_side = m_outputs.Add(SIDE_WIDTH, SIDE_HEIGHT);
    if (!m_side)
        m_missing.emplace_back(
            "monitors to plug in and out (packages: xserver-xorg-core "
            "xserver-xorg-video-dummy x11-xserver-utils)");
}

void RealDesk::SetComposited(bool isComposited) {
    if (!isComposited)
        m_compositor.reset();
    else if (m_compositor == nullptr && HasPicom())
        m_compositor = XProgram::Picom(m_server);
}

void RealDesk::PlugSide(bool isOn) {
    if (m_side)
        m_outputs.SetOn(*m_side, isOn);
}

void RealDesk::ResizeMain(bool isSmall) {
    m_outputs.Resize(X11Outputs::First(), isSmall ? SIDE_WIDTH : WIDTH, isSmall ? SIDE_HEIGHT : HEIGHT);
}

RealClient& RealDesk::Start(RealKind kind, bool isSecret) {
    m_clients.push_back(
        std::make_unique<RealClient>(m_server, m_files, RealClient::Plan{kind, isSecret, ++m_started}));
    return *m_clients.back();
}

void RealDesk::End(const RealClient& client) {
    std::erase_if(m_clients, [&client](const auto& each) { return each.get() == &client; });
}

void RealDesk::Look() {
    const std::vector<std::uint32_t> listed = m_link.Property(m_link.Root(), "_NET_CLIENT_LIST");
    for (const auto& client : m_clients)
        client->Look(m_link, listed);
}
