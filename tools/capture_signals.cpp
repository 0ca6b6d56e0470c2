// SPDX-License-Identifier: Apache-2.0
#include "tools/capture_signals.h"

#include <poll.h>
#include <pthread.h>
#include <sys/eventfd.h>
#include <sys/signalfd.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <system_error>

namespace {

int Checked(int descriptor) {
    if (descriptor < 0)
        throw std::system_error(errno, std::generic_category(), "cannot wait for signals");
    return descriptor;
}

int OpenSignals() {
    sigset_t signals;
    sigemptyset(&signals);
    sigaddset(&signals, SIGINT);
    sigaddset(&signals, SIGTERM);
    pthread_sigmask(SIG_BLOCK, &signals, nullptr);
    std::signal(SIGPIPE, SIG_IGN);
    return signalfd(-1, &signals, SFD_CLOEXEC);
}

} // namespace

StopNotice::StopNotice(int descriptor) : m_descriptor(Checked(descriptor)) {}

StopNotice::~StopNotice() {
    close(m_descriptor);
}

bool StopNotice::IsRaised() const noexcept {
    pollfd notice{m_descriptor, POLLIN, 0};
    return poll(&notice, 1, 0) > 0;
}

StopFlag::StopFlag() : StopNotice(eventfd(0, EFD_CLOEXEC)) {}

void StopFlag::Raise() noexcept {
    // Fails only for a count that nobody reaches.
    [[maybe_unused]] const int result = eventfd_write(Descriptor(), 1);
}

StopSignals::StopSignals() : StopNotice(OpenSignals()) {}
