// SPDX-License-Identifier: Apache-2.0
#include "tests/x11/x11_desk.h"

#include <gtest/gtest.h>
#include <xcb/xtest.h>

#include <algorithm>
#include <array>
#include <cstdio>
#include <utility>

namespace {

using namespace platform;

std::string PlaceText(const CGRect& frame) {
    std::array<char, 64> text{};
    std::snprintf(text.data(), text.size(), "%d %d %d %d", static_cast<int>(frame.origin.x),
                  static_cast<int>(frame.origin.y), static_cast<int>(frame.size.width),
                  static_cast<int>(frame.size.height));
    return text.data();
}

std::string ColourText(std::uint32_t rgb) {
    std::array<char, 16> text{};
    std::snprintf(text.data(), text.size(), "%06x", static_cast<unsigned>(rgb));
    return text.data();
}

} // namespace

std::vector<std::string> X11DeskOptions::Programs() const {
    std::vector<std::string> programs = XServer::ProgramsOf(server.kind);
    if (manager == Manager::Openbox)
        programs.emplace_back("openbox");
    if (manager == Manager::Mutter)
        programs.insert(programs.end(), {"mutter", "dbus-run-session"});
    if (picom)
        programs.emplace_back("picom");
    if (tint2)
        programs.emplace_back("tint2");
    if (server.kind == XServer::Kind::Xorg)
        programs.emplace_back("xrandr");
    return programs;
}

X11Desk::X11Desk(X11DeskOptions options)
    : m_options(std::move(options)),
      m_rig(m_options.server),
      m_server(std::make_shared<X11WindowServer>(m_rig.Display())) {
    StartPrograms();
    MakeMarker();
}

X11Desk::~X11Desk() {
    // It would see everything else go, one by one.
    m_server.reset();
}

void X11Desk::StartPrograms() {
    if (m_options.manager == X11DeskOptions::Manager::Openbox)
        m_manager = XProgram::Openbox(m_rig);
    if (m_options.manager == X11DeskOptions::Manager::Mutter)
        m_manager = XProgram::Mutter(m_rig);
    if (m_options.picom)
        m_compositor = XProgram::Picom(m_rig);
    if (m_options.tint2)
        m_panel = XProgram::Tint2(m_rig);
}

/// Windows that nobody sees: just outside of the screen, never mapped, and only for input. The first has a
/// background: should somebody move it onto the screen, the server can paint it.
void X11Desk::MakeMarker() {
    m_link = std::make_unique<XLink>(m_rig.Display());
    m_marker = xcb_generate_id(m_link->Get());
    const std::uint32_t redirect = 1;
    const std::array<std::uint32_t, 2> painted{0, redirect};
    xcb_create_window(m_link->Get(), XCB_COPY_FROM_PARENT, m_marker, m_link->Root(), -10, -10, 1, 1, 0,
                      XCB_WINDOW_CLASS_INPUT_OUTPUT, XCB_COPY_FROM_PARENT,
                      XCB_CW_BACK_PIXEL | XCB_CW_OVERRIDE_REDIRECT, painted.data());
    xcb_map_window(m_link->Get(), m_marker);
    m_question = xcb_generate_id(m_link->Get());
    xcb_create_window(m_link->Get(), XCB_COPY_FROM_PARENT, m_question, m_link->Root(), -10, -10, 1, 1, 0,
                      XCB_WINDOW_CLASS_COPY_FROM_PARENT, XCB_COPY_FROM_PARENT, 0, nullptr);
    m_glass = xcb_generate_id(m_link->Get());
    const xcb_screen_t& screen = m_link->Screen();
    xcb_create_window(m_link->Get(), 0, m_glass, m_link->Root(), 0, 0, screen.width_in_pixels,
                      screen.height_in_pixels, 0, XCB_WINDOW_CLASS_INPUT_ONLY, XCB_COPY_FROM_PARENT,
                      XCB_CW_OVERRIDE_REDIRECT, &redirect);
    m_link->RoundTrip();
}

// ---- Settling

void X11Desk::WaitForManager() {
    m_link->AskForFrame(m_question);
    EXPECT_TRUE(ComesTrue([this] { return m_link->HasAnswered(m_question); }))
        << "the window manager doesn't answer";
}

void X11Desk::Settle() {
    if (m_deaf || !m_rig.IsRunning())
        return;
    if (Managed())
        WaitForManager();
    const std::string title = "settled " + std::to_string(++m_counter);
    xcb_change_property(m_link->Get(), XCB_PROP_MODE_REPLACE, m_marker, m_link->Atom("_NET_WM_NAME"),
                        m_link->Atom("UTF8_STRING"), 8, static_cast<std::uint32_t>(title.size()),
                        title.data());
    m_link->RoundTrip();
    EXPECT_TRUE(ComesTrue([&] {
        const auto windows = m_server->GetWindows();
        for (const WindowInfo& window : windows->Windows()) {
            if (window.title == title)
                return true;
        }
        return false;
    })) << "the window server doesn't follow";
}

// ---- Applications and windows

std::optional<pid_t> X11Desk::StartApplication(const std::string& name) {
    auto client = std::make_unique<X11Client>(m_rig, name);
    const pid_t pid = client->Pid();
    m_applications[pid] = std::move(client);
    return pid;
}

bool X11Desk::EndApplication(pid_t pid) {
    std::erase_if(m_windows, [pid](const auto& each) { return each.second.owner == pid; });
    return m_applications.erase(pid) != 0;
}

X11Client* X11Desk::Application(pid_t pid) {
    const auto found = m_applications.find(pid);
    return found != m_applications.end() ? found->second.get() : nullptr;
}

std::string X11Desk::NameOf(CGWindowID id) const {
    const auto found = m_windows.find(id);
    return found != m_windows.end() ? found->second.name : std::string();
}

bool X11Desk::Tell(const std::string& command, CGWindowID window, const std::string& rest) {
    const auto found = m_windows.find(window);
    X11Client* const client = found != m_windows.end() ? Application(found->second.owner) : nullptr;
    return client != nullptr && client->Tell(command + " " + found->second.name + " " + rest);
}

std::optional<CGWindowID> X11Desk::AddWindow(pid_t owner, const CGRect& frame, std::uint32_t rgb) {
    X11Client* const client = Application(owner);
    if (client == nullptr)
        return std::nullopt;
    const std::string name = "w" + std::to_string(++m_counter);
    const auto id = client->Create(name, PlaceText(frame) + " " + ColourText(rgb));
    if (!id)
        return std::nullopt;
    m_windows[*id] = {owner, name};
    if (Managed())
        WaitForManager();
    // Some window managers put what nobody has waited for behind what somebody works in.
    return Raise(*id) ? std::optional<CGWindowID>(*id) : std::nullopt;
}

bool X11Desk::Close(CGWindowID id) {
    const bool done = Tell("destroy", id);
    m_windows.erase(id);
    return done;
}

bool X11Desk::SetFrame(CGWindowID id, const CGRect& frame) {
    return Tell("place", id, PlaceText(frame));
}

bool X11Desk::Minimise(CGWindowID id) {
    return Managed() && Tell("minimise", id);
}

bool X11Desk::Restore(CGWindowID id) {
    return Managed() && Tell("restore", id);
}

bool X11Desk::Recolour(CGWindowID id, std::uint32_t rgb) {
    return Tell("recolour", id, ColourText(rgb));
}

bool X11Desk::SetAlpha(CGWindowID id, float alpha) {
    const auto found = m_windows.find(id);
    X11Client* const client = found != m_windows.end() ? Application(found->second.owner) : nullptr;
    const auto opacity = static_cast<std::uint32_t>(static_cast<double>(alpha) * 0xFFFFFFFFU);
    return Composited() && client != nullptr &&
           client->SetWords(found->second.name, "_NET_WM_WINDOW_OPACITY", "CARDINAL", {opacity});
}

bool X11Desk::Float(CGWindowID id) {
    return Managed() && Tell("above", id);
}

bool X11Desk::SetTitle(CGWindowID id, const std::string& title) {
    const auto found = m_windows.find(id);
    X11Client* const client = found != m_windows.end() ? Application(found->second.owner) : nullptr;
    return client != nullptr &&
           client->SetProperty(found->second.name, "_NET_WM_NAME", "UTF8_STRING", 8, title);
}

// ---- Displays

std::optional<CGDirectDisplayID> X11Desk::AddDisplay(const CGSize& size) {
    const auto before = m_server->GetDisplays();
    const auto name = m_outputs.Add(static_cast<int>(size.width), static_cast<int>(size.height));
    if (!name)
        return std::nullopt;
    std::optional<CGDirectDisplayID> added;
    const auto isNew = [&before](const DisplayInfo& display) {
        return std::none_of(before->begin(), before->end(),
                            [&display](const DisplayInfo& each) { return each.id == display.id; });
    };
    const bool came = ComesTrue([&] {
        const auto now = m_server->GetDisplays();
        const auto found = std::find_if(now->begin(), now->end(), isNew);
        if (found != now->end())
            added = found->id;
        return added.has_value();
    });
    EXPECT_TRUE(came) << *name << " was plugged in, and isn't listed";
    if (added)
        m_displays[*added] = *name;
    return added;
}

std::string X11Desk::OutputOf(CGDirectDisplayID id) const {
    const auto found = m_displays.find(id);
    return found != m_displays.end() ? found->second : X11Outputs::First();
}

bool X11Desk::Unplug(CGDirectDisplayID id) {
    return m_outputs.SetOn(OutputOf(id), false);
}

bool X11Desk::PlugInAgain(CGDirectDisplayID id) {
    return m_outputs.SetOn(OutputOf(id), true);
}

bool X11Desk::Resize(CGDirectDisplayID id, const CGSize& size) {
    return m_outputs.Resize(OutputOf(id), static_cast<int>(size.width), static_cast<int>(size.height));
}

bool X11Desk::MakeMain(CGDirectDisplayID id) {
    return m_outputs.MakePrimary(OutputOf(id));
}

bool X11Desk::ReserveTop(CGDirectDisplayID id, float points) {
    const auto displays = m_server->GetDisplays();
    const auto display = std::find_if(displays->begin(), displays->end(),
                                      [id](const DisplayInfo& each) { return each.id == id; });
    const auto pid = StartApplication("Panel");
    if (display == displays->end() || !pid)
        return false;
    const CGRect frame{display->bounds.origin, {display->bounds.size.width, points}};
    const auto left = static_cast<std::uint32_t>(frame.origin.x);
    const auto right = static_cast<std::uint32_t>(frame.origin.x + frame.size.width - 1);
    const auto height = static_cast<std::uint32_t>(points);
    X11Client& panel = *Application(*pid);
    return panel.Create("panel", PlaceText(frame) + " 808080 type=DOCK unmapped").has_value() &&
           panel.SetWords("panel", "_NET_WM_STRUT_PARTIAL", "CARDINAL",
                          {0, 0, height, 0, 0, 0, 0, 0, left, right, 0, 0}) &&
           panel.Tell("map panel");
}

// ---- Pointer

/// As a mouse does it.
bool X11Desk::MovePointer(const CGPoint& position) {
    xcb_test_fake_input(m_link->Get(), XCB_MOTION_NOTIFY, 0, XCB_CURRENT_TIME, m_link->Root(),
                        static_cast<std::int16_t>(position.x), static_cast<std::int16_t>(position.y), 0);
    m_link->RoundTrip();
    return m_link->Works();
}

bool X11Desk::WarpPointer(const CGPoint& position) {
    xcb_warp_pointer(m_link->Get(), XCB_NONE, m_link->Root(), 0, 0, 0, 0,
                     static_cast<std::int16_t>(position.x), static_cast<std::int16_t>(position.y));
    m_link->RoundTrip();
    return m_link->Works();
}

bool X11Desk::ChangeCursor() {
    if (!m_link->Works())
        return false;
    xcb_connection_t* const connection = m_link->Get();
    const xcb_pixmap_t block = xcb_generate_id(connection);
    const xcb_gcontext_t context = xcb_generate_id(connection);
    const xcb_cursor_t cursor = xcb_generate_id(connection);
    const std::uint32_t ones = 1;
    const xcb_rectangle_t all{0, 0, 16, 16};
    xcb_create_pixmap(connection, 1, block, m_link->Root(), all.width, all.height);
    xcb_create_gc(connection, context, block, XCB_GC_FOREGROUND, &ones);
    xcb_poly_fill_rectangle(connection, block, context, 1, &all);
    const auto red = static_cast<std::uint16_t>(++m_counter << 8);
    xcb_create_cursor(connection, cursor, block, block, red, 0xFFFF, 0, 0, 0, 0, 3, 3);
    const std::uint32_t above = XCB_STACK_MODE_ABOVE;
    xcb_change_window_attributes(connection, m_glass, XCB_CW_CURSOR, &cursor);
    xcb_configure_window(connection, m_glass, XCB_CONFIG_WINDOW_STACK_MODE, &above);
    xcb_map_window(connection, m_glass);
    xcb_free_cursor(connection, cursor);
    xcb_free_gc(connection, context);
    xcb_free_pixmap(connection, block);
    m_link->RoundTrip();
    return true;
}

// ---- The server itself

bool X11Desk::Stall() {
    m_rig.Stop();
    m_deaf = true;
    return true;
}

bool X11Desk::Answer() {
    m_rig.Continue();
    m_deaf = false;
    return true;
}

bool X11Desk::Lose() {
    m_rig.Kill();
    m_windows.clear();
    m_panel.reset();
    m_compositor.reset();
    m_manager.reset();
    return true;
}

bool X11Desk::FindAgain() {
    m_rig.Restart();
    StartPrograms();
    MakeMarker();
    EXPECT_TRUE(m_outputs.Redo());
    for (const auto& application : m_applications)
        EXPECT_TRUE(application.second->Tell("connect")) << "application " << application.first;
    return true;
}
