// SPDX-License-Identifier: Apache-2.0
#include "tests/x11/x11_client_driver.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <stdexcept>

namespace {

constexpr int ANSWER_MS = 30000;

} // namespace

X11Client::X11Client(const XServer& server, const std::string& name) {
    std::array<int, 2> to{};
    std::array<int, 2> from{};
    // Sockets, so that writing to one that has ended is an error and no signal.
    if (socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, to.data()) != 0 ||
        socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, from.data()) != 0)
        throw std::runtime_error("no sockets");
    m_toIt = to[0];
    m_fromIt = from[0];
    CChildProcess::Plan plan;
    plan.command = {SCREENSHARE_X11_CLIENT, name};
    plan.environment = {{"DISPLAY", server.Display()}};
    plan.input = to[1];
    plan.output = from[1];
    m_process = std::make_unique<CChildProcess>(plan);
    close(to[1]);
    close(from[1]);
    std::string answer;
    if (!ReadLine(answer) || answer != "ok")
        throw std::runtime_error("the application " + name + " doesn't start");
}

X11Client::~X11Client() {
    m_process.reset();
    close(m_toIt);
    close(m_fromIt);
}

bool X11Client::Tell(const std::string& line, std::string* answer) {
    const std::string sent = line + "\n";
    for (std::size_t done = 0; done < sent.size();) {
        const ssize_t count = send(m_toIt, sent.data() + done, sent.size() - done, MSG_NOSIGNAL);
        if (count <= 0)
            return false;
        done += static_cast<std::size_t>(count);
    }
    std::string answered;
    if (!ReadLine(answered) || answered.rfind("ok", 0) != 0)
        return false;
    if (answer != nullptr)
        *answer = answered.size() > 3 ? answered.substr(3) : std::string();
    return true;
}

std::optional<std::uint32_t> X11Client::Create(const std::string& name,
                                               const std::string& placeColourAndOptions) {
    std::string answer;
    if (!Tell("create " + name + " " + placeColourAndOptions, &answer))
        return std::nullopt;
    return static_cast<std::uint32_t>(std::stoul(answer));
}

bool X11Client::SetProperty(const std::string& window, const std::string& property, const std::string& type,
                            int format, const std::string& bytes) {
    static constexpr char DIGITS[] = "0123456789abcdef";
    std::string hex;
    for (const char each : bytes) {
        hex += DIGITS[static_cast<unsigned char>(each) >> 4];
        hex += DIGITS[static_cast<unsigned char>(each) & 15];
    }
    return Tell("property " + window + " " + property + " " + type + " " + std::to_string(format) + " " +
                hex);
}

bool X11Client::SetWords(const std::string& window, const std::string& property, const std::string& type,
                         const std::vector<std::uint32_t>& words) {
    const auto* const bytes = reinterpret_cast<const char*>(words.data());
    return SetProperty(window, property, type, 32, std::string(bytes, words.size() * 4));
}

bool X11Client::ReadLine(std::string& line) {
    for (;;) {
        const std::size_t end = m_read.find('\n');
        if (end != std::string::npos) {
            line = m_read.substr(0, end);
            m_read.erase(0, end + 1);
            return true;
        }
        pollfd readable{m_fromIt, POLLIN, 0};
        if (poll(&readable, 1, ANSWER_MS) != 1)
            return false;
        std::array<char, 256> bytes{};
        const ssize_t count = read(m_fromIt, bytes.data(), bytes.size());
        if (count <= 0)
            return false;
        m_read.append(bytes.data(), static_cast<std::size_t>(count));
    }
}
