// SPDX-License-Identifier: Apache-2.0
#pragma once

class ACmThread;

namespace platform {

/// Marks the calling thread, for a scope, as one that runs the platform's work. `thread` is the platform's
/// own thread, null when one of somebody else is borrowed; it outlives the scope.
class PlatformThreadScope {
public:
    explicit PlatformThreadScope(const ACmThread* thread);
    ~PlatformThreadScope();
    PlatformThreadScope(const PlatformThreadScope&) = delete;
    PlatformThreadScope& operator=(const PlatformThreadScope&) = delete;

private:
    const ACmThread* const m_thread;
    const PlatformThreadScope* const m_outer;

    friend bool OnPlatformThread();
    friend bool OnEndingPlatformThread();
};

/// On such a thread nobody waits for the platform's threads: they may be waiting for this one.
bool OnPlatformThread();

/// On such a thread when it has been told to end, or while the platform comes to rest. What it calls must
/// start nothing anew, or that would never end.
bool OnEndingPlatformThread();

/// The platform comes to rest for the length of a scope.
class PlatformRestScope {
public:
    PlatformRestScope();
    ~PlatformRestScope();
    PlatformRestScope(const PlatformRestScope&) = delete;
    PlatformRestScope& operator=(const PlatformRestScope&) = delete;
};

} // namespace platform
