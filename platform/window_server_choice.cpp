// SPDX-License-Identifier: Apache-2.0
#include "platform/window_server_choice.h"

#include "platform/window_server.h"
#include "util/cm_trace.h"

#include <algorithm>
#include <cstdlib>
#include <string>
#include <utility>

namespace platform {

namespace {

constexpr const char* UNKNOWN =
    "SCREENSHARE_PLATFORM names no window server, going on without one, asked for=";
constexpr const char* NOT_IN_THIS_BUILD =
    "SCREENSHARE_PLATFORM asks for a window server that is not available in this build, going on without one, "
    "asked for=";
constexpr const char* NOT_TO_BE_HAD = "The window server could not be made, going on without one, asked for=";

const char* WordAskedFor() {
    const char* const word = std::getenv("SCREENSHARE_PLATFORM");
    return word != nullptr && *word != '\0' ? word : "auto";
}

} // namespace

struct WindowServerChoice::Choice {
    std::shared_ptr<WindowServer> server;
    std::string word;
    const char* complaint = nullptr; // null when `server` is what was asked for
};

WindowServerChoice::WindowServerChoice(std::span<const WindowServerMaker> makers,
                                       std::shared_ptr<WindowServer> empty)
    : m_makers(makers),
      m_empty(std::move(empty)) {}

std::shared_ptr<WindowServer> WindowServerChoice::Current() {
    {
        std::unique_lock<std::mutex> lock = LockWhenSettled();
        if (!lock.owns_lock())
            return m_empty;
        if (m_inForce != nullptr)
            return m_inForce;
        m_chooser = std::this_thread::get_id();
        m_choosing = true;
    }
    return MakeAndPublish();
}

std::shared_ptr<WindowServer> WindowServerChoice::Replace(std::shared_ptr<WindowServer> server) {
    const std::unique_lock<std::mutex> lock = LockWhenSettled();
    if (!lock.owns_lock()) {
        CmReportFailedCheck("a window server is not replaced by its maker");
        return nullptr;
    }
    return std::exchange(m_inForce, std::move(server));
}

std::shared_ptr<WindowServer> WindowServerChoice::Chosen() {
    const std::unique_lock<std::mutex> lock = LockWhenSettled();
    return lock.owns_lock() ? m_inForce : nullptr;
}

void WindowServerChoice::BeforeFork() {
    m_mutex.lock();
}

void WindowServerChoice::AfterForkInParent() {
    m_mutex.unlock();
}

void WindowServerChoice::AfterForkInChild() {
    // The only thread here is the one that forked: what another one was making will never be ready.
    if (m_chooser != std::this_thread::get_id())
        m_choosing = false;
    m_mutex.unlock();
}

WindowServerChoice::Choice WindowServerChoice::Choose() const {
    Choice choice{.server = m_empty, .word = {}, .complaint = NOT_TO_BE_HAD};
    try {
        choice.word = WordAskedFor();
        const auto maker = std::find_if(m_makers.begin(), m_makers.end(),
                                        [&choice](const auto& each) { return each.word == choice.word; });
        if (maker == m_makers.end()) {
            choice.complaint = UNKNOWN;
        } else if (maker->make == nullptr) {
            choice.complaint = NOT_IN_THIS_BUILD;
        } else if (std::shared_ptr<WindowServer> made = maker->make()) {
            choice.server = std::move(made);
            choice.complaint = nullptr;
        }
    } catch (...) { // NOLINT(bugprone-empty-catch): the complaint stands
    }
    return choice;
}

std::shared_ptr<WindowServer> WindowServerChoice::MakeAndPublish() {
    Choice choice = Choose();
    {
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_inForce = choice.server;
        m_choosing = false;
    }
    m_choosing.notify_all();

    // Not earlier: the client's receiver may hand the line to a thread that waits for the window server.
    if (choice.complaint != nullptr)
        CmTraceWarning(choice.complaint, choice.word);
    return std::move(choice.server);
}

/// Owns nothing on the thread that is making a server.
std::unique_lock<std::mutex> WindowServerChoice::LockWhenSettled() {
    for (;;) {
        std::unique_lock<std::mutex> lock(m_mutex);
        if (!m_choosing)
            return lock;
        if (m_chooser == std::this_thread::get_id())
            return {};
        lock.unlock();
        m_choosing.wait(true);
    }
}

} // namespace platform
