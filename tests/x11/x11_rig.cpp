// SPDX-License-Identifier: Apache-2.0
#include "tests/x11/x11_rig.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <chrono>
#include <cstdlib>
#include <fstream>
#include <sstream>
#include <stdexcept>
#include <thread>
#include <utility>

namespace {

constexpr int START_MS = 30000;
// Far from where servers of people and of other programs are; those take the first free number.
constexpr int FIRST_NUMBER = 200;
constexpr int LAST_NUMBER = 999;

std::string EndOfFile(const std::string& file) {
    std::ifstream stream(file);
    std::stringstream text;
    text << stream.rdbuf();
    const std::string all = text.str();
    return all.size() > 2000 ? all.substr(all.size() - 2000) : all;
}

/// What the server has written into its end of the pipe once it was ready; empty when it has ended instead.
std::string ReadReadiness(int descriptor) {
    std::string text;
    pollfd readable{descriptor, POLLIN, 0};
    while (poll(&readable, 1, START_MS) == 1) {
        char bytes[64];
        const ssize_t count = read(descriptor, bytes, sizeof(bytes));
        if (count <= 0)
            return {};
        text.append(bytes, static_cast<std::size_t>(count));
        if (text.find('\n') != std::string::npos)
            return text;
    }
    return {};
}

/// A name that only one process of the machine has at a time, and that ends with it; -1 when it is taken.
int TakeName(const std::string& name) {
    const int descriptor = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    name.copy(address.sun_path + 1, sizeof(address.sun_path) - 2);
    const auto length = static_cast<socklen_t>(offsetof(sockaddr_un, sun_path) + 1 + name.size());
    if (bind(descriptor, reinterpret_cast<const sockaddr*>(&address), length) == 0)
        return descriptor;
    close(descriptor);
    return -1;
}

std::string SocketOf(int number) {
    return "/tmp/.X11-unix/X" + std::to_string(number);
}

std::string LockOf(int number) {
    return "/tmp/.X" + std::to_string(number) + "-lock";
}

bool IsReady(const XProgram::Ready& ready, const std::string& display) {
    const XLink link(display);
    return link.Works() && ready(link);
}

/// A name that no later connection has for a window of its own.
xcb_window_t LastNameOf(const XLink& link) {
    const xcb_setup_t& setup = *xcb_get_setup(link.Get());
    return setup.resource_id_base | setup.resource_id_mask;
}

/// A window manager announces itself before it listens, and may lose what it is asked meanwhile. So it is one
/// when it answers, however long that takes it. What it was asked more often than that it answers later, and
/// puts a frame around whatever window has the name by then.
bool HasWindowManager(const XLink& link) {
    if (link.Property(link.Root(), "_NET_SUPPORTING_WM_CHECK").empty())
        return false;
    const xcb_window_t window = LastNameOf(link);
    xcb_create_window(link.Get(), XCB_COPY_FROM_PARENT, window, link.Root(), -10, -10, 1, 1, 0,
                      XCB_WINDOW_CLASS_COPY_FROM_PARENT, XCB_COPY_FROM_PARENT, 0, nullptr);
    for (int attempt = 0; attempt < 40; ++attempt) {
        link.AskForFrame(window);
        if (ComesTrue([&] { return link.HasAnswered(window); }, std::chrono::milliseconds(50)))
            return true;
    }
    return false;
}

bool HasCompositor(const XLink& link) {
    return link.OwnerOf("_NET_WM_CM_S0") != XCB_WINDOW_NONE;
}

} // namespace

std::optional<std::string> MissingProgram(const std::vector<std::string>& programs) {
    for (const std::string& program : programs) {
        if (!FindProgram(program).empty())
            continue;
        const std::string line = "not installed: " + program;
        const char* const ci = std::getenv("CI");
        if (ci != nullptr && std::string(ci) == "true")
            throw std::runtime_error(line);
        return line;
    }
    return std::nullopt;
}

bool ComesTrue(const std::function<bool()>& condition, std::chrono::milliseconds limit) {
    const auto deadline = std::chrono::steady_clock::now() + limit;
    while (!condition()) {
        if (std::chrono::steady_clock::now() >= deadline)
            return false;
        // Asking a server costs it time that it needs for getting there.
        std::this_thread::sleep_for(std::chrono::milliseconds(2));
    }
    return true;
}

// ---- Servers

XServer::XServer(XServerOptions options) : m_options(std::move(options)) {
    if (m_options.kind == Kind::Xorg)
        WriteConfiguration();
    for (int attempt = 0; attempt < 5; ++attempt) {
        Reserve();
        if (Launch())
            return;
        close(std::exchange(m_reservation, -1));
    }
    throw std::runtime_error("the X server doesn't start: " + EndOfFile(m_folder.File("server.log")));
}

XServer::~XServer() {
    if (m_process != nullptr) {
        Continue();
        m_process->End();
        m_process.reset();
    }
    RemoveTraces();
    close(m_reservation);
}

std::vector<std::string> XServer::ProgramsOf(Kind kind) {
    if (kind == Kind::Xvfb)
        return {"Xvfb"};
    // The driver is a package of its own.
    return {"/usr/lib/xorg/Xorg"};
}

void XServer::Kill() {
    if (m_process == nullptr)
        return;
    m_process->Kill();
    m_process.reset();
    m_stopped = false;
}

void XServer::Stop() {
    m_process->Signal(SIGSTOP);
    m_stopped = true;
    // A signal is sent at once and obeyed soon.
    const std::string file = "/proc/" + std::to_string(Pid()) + "/stat";
    ComesTrue([&file] {
        const std::string status = EndOfFile(file);
        const std::size_t name = status.rfind(')');
        return name == std::string::npos || status.compare(name, 3, ") T") == 0;
    });
}

void XServer::Continue() {
    if (std::exchange(m_stopped, false))
        m_process->Signal(SIGCONT);
}

void XServer::Restart() {
    Kill();
    RemoveTraces();
    if (!Launch())
        throw std::runtime_error("the X server doesn't start again: " +
                                 EndOfFile(m_folder.File("server.log")));
}

/// Takes a number that no other test has, and that no server listens on.
void XServer::Reserve() {
    static int next = FIRST_NUMBER + static_cast<int>(getpid()) % 200;
    for (int tries = 0; tries <= LAST_NUMBER - FIRST_NUMBER; ++tries) {
        const int number = next++;
        if (next > LAST_NUMBER)
            next = FIRST_NUMBER;
        m_reservation = TakeName("screenshare-test-display-" + std::to_string(number));
        if (m_reservation < 0)
            continue;
        m_number = number;
        if (access(LockOf(number).c_str(), F_OK) != 0 && access(SocketOf(number).c_str(), F_OK) != 0)
            return;
        // What a killed test has left behind is taken away; what is alive stays.
        const XLink link(Display());
        if (!link.Works()) {
            RemoveTraces();
            return;
        }
        close(std::exchange(m_reservation, -1));
    }
    throw std::runtime_error("no number is left for an X server");
}

bool XServer::Launch() {
    int ends[2];
    if (pipe2(ends, O_CLOEXEC) != 0)
        throw std::runtime_error("no pipe");
    CChildProcess::Plan plan;
    plan.command = Command(ends[1]);
    plan.environment = {{"HOME", m_folder.Path().string()}};
    plan.log = m_folder.File("output.log");
    plan.keep = ends[1];
    m_process = std::make_unique<CChildProcess>(plan);
    close(ends[1]);
    const std::string ready = ReadReadiness(ends[0]);
    close(ends[0]);
    if (ready == std::to_string(m_number) + "\n")
        return true;
    m_process.reset();
    return false;
}

std::vector<std::string> XServer::Command(int readyDescriptor) const {
    std::vector<std::string> command = ProgramsOf(m_options.kind);
    command.insert(command.end(), {Display(), "-displayfd", std::to_string(readyDescriptor), "-noreset",
                                   "-nolisten", "tcp"});
    if (m_options.kind == Kind::Xvfb) {
        const std::string size = std::to_string(m_options.width) + "x" + std::to_string(m_options.height) +
                                 "x" + std::to_string(m_options.depth);
        command.insert(command.end(), {"-screen", "0", size});
    } else {
        command.insert(command.end(), {"-novtswitch", "-sharevts", "-config", m_folder.File("xorg.conf"),
                                       "-logfile", m_folder.File("server.log")});
    }
    command.insert(command.end(), m_options.arguments.begin(), m_options.arguments.end());
    return command;
}

void XServer::WriteConfiguration() const {
    const std::string size = std::to_string(m_options.width) + "x" + std::to_string(m_options.height);
    std::ofstream file(m_folder.File("xorg.conf"));
    file << R"(Section "ServerFlags"
    Option "AutoAddDevices" "false"
    Option "AutoEnableDevices" "false"
    Option "DontVTSwitch" "true"
    Option "AllowMouseOpenFail" "true"
    Option "BlankTime" "0"
EndSection
Section "Device"
    Identifier "device"
    Driver "dummy"
    VideoRam 256000
EndSection
Section "Monitor"
    Identifier "monitor"
    HorizSync 5.0-1000.0
    VertRefresh 5.0-200.0
EndSection
Section "Screen"
    Identifier "screen"
    Device "device"
    Monitor "monitor"
    DefaultDepth )"
         << m_options.depth << R"(
    SubSection "Display"
        Depth )"
         << m_options.depth << R"(
        Modes ")"
         << size << R"("
        Virtual 3840 2160
    EndSubSection
EndSection
)";
}

/// Only of servers of ours that have ended: the number is reserved.
void XServer::RemoveTraces() const {
    unlink(SocketOf(m_number).c_str());
    unlink(LockOf(m_number).c_str());
}

// ---- Connections

XLink::XLink(const std::string& display) : m_connection(xcb_connect(display.c_str(), nullptr)) {
    if (xcb_connection_has_error(m_connection) == 0)
        m_screen = xcb_setup_roots_iterator(xcb_get_setup(m_connection)).data;
}

XLink::~XLink() {
    xcb_disconnect(m_connection);
}

xcb_atom_t XLink::Atom(const std::string& name) const {
    const auto cookie =
        xcb_intern_atom(m_connection, 0, static_cast<std::uint16_t>(name.size()), name.data());
    xcb_intern_atom_reply_t* const reply = xcb_intern_atom_reply(m_connection, cookie, nullptr);
    const xcb_atom_t atom = reply != nullptr ? reply->atom : static_cast<xcb_atom_t>(XCB_ATOM_NONE);
    std::free(reply);
    return atom;
}

xcb_window_t XLink::OwnerOf(const std::string& selection) const {
    const auto cookie = xcb_get_selection_owner(m_connection, Atom(selection));
    xcb_get_selection_owner_reply_t* const reply =
        xcb_get_selection_owner_reply(m_connection, cookie, nullptr);
    const xcb_window_t owner = reply != nullptr ? reply->owner : static_cast<xcb_window_t>(XCB_WINDOW_NONE);
    std::free(reply);
    return owner;
}

std::vector<std::uint32_t> XLink::Property(xcb_window_t window, const std::string& name) const {
    const auto cookie =
        xcb_get_property(m_connection, 0, window, Atom(name), XCB_GET_PROPERTY_TYPE_ANY, 0, 1024);
    xcb_get_property_reply_t* const reply = xcb_get_property_reply(m_connection, cookie, nullptr);
    std::vector<std::uint32_t> values;
    if (reply != nullptr && reply->format == 32) {
        const auto* const first = static_cast<const std::uint32_t*>(xcb_get_property_value(reply));
        values.assign(first, first + xcb_get_property_value_length(reply) / 4);
    }
    std::free(reply);
    return values;
}

void XLink::AskForFrame(xcb_window_t window) const {
    xcb_delete_property(m_connection, window, Atom("_NET_FRAME_EXTENTS"));
    xcb_client_message_event_t question{};
    question.response_type = XCB_CLIENT_MESSAGE;
    question.format = 32;
    question.window = window;
    question.type = Atom("_NET_REQUEST_FRAME_EXTENTS");
    xcb_send_event(m_connection, 0, Root(),
                   XCB_EVENT_MASK_SUBSTRUCTURE_NOTIFY | XCB_EVENT_MASK_SUBSTRUCTURE_REDIRECT,
                   reinterpret_cast<const char*>(&question));
    xcb_flush(m_connection);
}

bool XLink::HasAnswered(xcb_window_t window) const {
    return !Property(window, "_NET_FRAME_EXTENTS").empty();
}

void XLink::RoundTrip() const {
    std::free(xcb_get_input_focus_reply(m_connection, xcb_get_input_focus(m_connection), nullptr));
}

// ---- Programs

namespace {

CChildProcess::Plan PlanOf(const XServer& server, const std::vector<std::string>& command,
                           const CScratchFolder& home) {
    CChildProcess::Plan plan;
    plan.command = command;
    // Nothing of the user's settings, and nothing of the user's session.
    plan.environment = {{"DISPLAY", server.Display()},
                        {"HOME", home.Path().string()},
                        {"XDG_CONFIG_HOME", home.File("config")},
                        {"XDG_CACHE_HOME", home.File("cache")},
                        {"XDG_DATA_HOME", home.File("data")},
                        {"XDG_RUNTIME_DIR", home.Path().string()},
                        {"XAUTHORITY", home.File("none")},
                        {"NO_AT_BRIDGE", "1"},
                        {"LIBGL_ALWAYS_SOFTWARE", "1"}};
    plan.log = home.File("output.log");
    return plan;
}

} // namespace

XProgram::XProgram(const XServer& server, const std::vector<std::string>& command, const Ready& ready)
    : m_process(PlanOf(server, command, m_folder)) {
    if (!ready)
        return;
    const bool done = ComesTrue([&] { return !m_process.IsRunning() || IsReady(ready, server.Display()); });
    if (!done || !m_process.IsRunning())
        throw std::runtime_error(command[0] +
                                 " doesn't get ready: " + EndOfFile(m_folder.File("output.log")));
}

bool XProgram::Run(const XServer& server, const std::vector<std::string>& command) {
    XProgram program(server, command);
    return program.m_process.WaitForEnd(START_MS) && program.m_process.HasSucceeded();
}

std::unique_ptr<XProgram> XProgram::Openbox(const XServer& server) {
    return std::make_unique<XProgram>(server, std::vector<std::string>{"openbox", "--sm-disable"},
                                      HasWindowManager);
}

std::unique_ptr<XProgram> XProgram::Picom(const XServer& server) {
    const std::vector<std::string> command{"picom", "--config", "/dev/null", "--backend", "xrender"};
    return std::make_unique<XProgram>(server, command, HasCompositor);
}

std::unique_ptr<XProgram> XProgram::Mutter(const XServer& server) {
    const std::vector<std::string> command{"dbus-run-session", "--", "mutter", "--x11"};
    return std::make_unique<XProgram>(
        server, command, [](const XLink& link) { return HasWindowManager(link) && HasCompositor(link); });
}

std::unique_ptr<XProgram> XProgram::Tint2(const XServer& server) {
    return std::make_unique<XProgram>(server, std::vector<std::string>{"tint2"}, [](const XLink& link) {
        return !link.Property(link.Root(), "_NET_CLIENT_LIST").empty();
    });
}
