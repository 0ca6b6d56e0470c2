// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <memory>
#include <mutex>
#include <span>
#include <string_view>
#include <thread>

namespace platform {

class WindowServer;

/// One kind of window server that SCREENSHARE_PLATFORM can ask for.
struct WindowServerMaker {
    std::string_view word;
    /// Gives null, or throws, when it can't be had. Itself null for a kind that this build doesn't have.
    std::shared_ptr<WindowServer> (*make)();
};

/// Which window server is in force. Chosen by SCREENSHARE_PLATFORM when somebody asks for it first; the word
/// "auto" stands in for a variable that is empty or not set.
///
/// Threads:  any. One thread makes the server, holding no lock; the others that ask meanwhile wait for it.
///           So a maker must neither ask for the server in force nor wait for a thread that does. On its own
///           thread it would get the empty server; from another one it would wait for ever.
/// Lifetime: keeps the server in force. One that is replaced ends with its last user. Forking:  with the
///           three fork functions called, a child finds the choice in order, whatever other threads were at
///           in the parent.
/// Errors:   nothing throws. What can't be had is traced at WARNING, once for each choice.
class WindowServerChoice {
public:
    /// `empty` is in force where nothing else can be had, and not null. `makers` must outlive the object.
    WindowServerChoice(std::span<const WindowServerMaker> makers, std::shared_ptr<WindowServer> empty);

    /// Never null.
    std::shared_ptr<WindowServer> Current();

    /// Puts a server in force and gives the one that was, null if none has been chosen. Null has the next
    /// Current choose anew. From inside a maker it is a failed check that changes nothing.
    std::shared_ptr<WindowServer> Replace(std::shared_ptr<WindowServer> server);

    /// The server in force, null while none has been chosen.
    std::shared_ptr<WindowServer> Chosen();

    void BeforeFork();
    void AfterForkInParent();
    void AfterForkInChild();

private:
    struct Choice;

    Choice Choose() const;
    std::shared_ptr<WindowServer> MakeAndPublish();
    std::unique_lock<std::mutex> LockWhenSettled();

    const std::span<const WindowServerMaker> m_makers;
    const std::shared_ptr<WindowServer> m_empty;

    std::mutex m_mutex;
    std::shared_ptr<WindowServer> m_inForce; // guarded by m_mutex
    std::thread::id m_chooser;               // guarded by m_mutex; says something while m_choosing

    // Changed under m_mutex, waited for without it. An atomic and not a condition: a condition keeps count of
    // its waiting threads, and in a forked process it would wait for some that aren't there.
    std::atomic<bool> m_choosing{false};
};

} // namespace platform
