// SPDX-License-Identifier: Apache-2.0
#include "console.h"

#include "commands.h"

#include <poll.h>
#include <pthread.h>
#include <sys/signalfd.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <csignal>
#include <cstdio>

namespace {

// Nobody types that much; whatever does is cut rather than kept.
constexpr std::size_t longestLine = 1000;

int OpenSignals() {
    sigset_t signals;
    sigemptyset(&signals);
    sigaddset(&signals, SIGINT);
    sigaddset(&signals, SIGTERM);
    pthread_sigmask(SIG_BLOCK, &signals, nullptr);
    return signalfd(-1, &signals, SFD_CLOEXEC);
}

} // namespace

Console::Console() : m_signalFd(OpenSignals()) {}

Console::~Console() {
    close(m_signalFd);
}

void Console::Run(IShareCaptureEngine& engine, int endFd, std::chrono::seconds limit) {
    using Clock = std::chrono::steady_clock;
    const auto deadline = Clock::now() + limit;
    while (true) {
        int wait = -1;
        if (limit.count() > 0) {
            const auto left = std::chrono::ceil<std::chrono::milliseconds>(deadline - Clock::now());
            if (left.count() <= 0) {
                return;
            }
            wait = static_cast<int>(left.count());
        }
        // A negative descriptor is one that poll passes over.
        std::array<pollfd, 3> inputs{
            {{m_signalFd, POLLIN, 0}, {endFd, POLLIN, 0}, {m_inputOpen ? STDIN_FILENO : -1, POLLIN, 0}}};
        poll(inputs.data(), inputs.size(), wait);
        if (inputs[0].revents != 0 || inputs[1].revents != 0) {
            return;
        }
        if (inputs[2].revents != 0 && !ReadCommands(engine)) {
            return;
        }
    }
}

bool Console::ReadCommands(IShareCaptureEngine& engine) {
    std::array<char, 256> buffer{};
    const ssize_t length = read(STDIN_FILENO, buffer.data(), buffer.size());
    if (length > 0) {
        m_input.append(buffer.data(), static_cast<std::size_t>(length));
        return RunLines(engine);
    }
    // The end of the input isn't the end of the run; its last line may lack the line end.
    m_inputOpen = false;
    m_input += '\n';
    return RunLines(engine);
}

bool Console::RunLines(IShareCaptureEngine& engine) {
    for (std::size_t end = m_input.find('\n'); end != std::string::npos; end = m_input.find('\n')) {
        const std::string line = m_input.substr(0, end);
        m_input.erase(0, end + 1);
        if (!RunCommand(engine, line)) {
            return false;
        }
    }
    m_input.resize(std::min(m_input.size(), longestLine));
    return true;
}
