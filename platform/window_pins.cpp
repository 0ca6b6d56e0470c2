// SPDX-License-Identifier: Apache-2.0
#include "platform/window_pins.h"

#include "platform/notices.h"
#include "platform/one_per_process.h"
#include "util/cm_clock.h"
#include "util/cm_thread.h"

#include <algorithm>
#include <iterator>
#include <mutex>
#include <new>
#include <utility>
#include <vector>

namespace platform {

namespace {

struct Pin {
    CmThreadId thread = 0;
    std::weak_ptr<WindowServer> server; // weak, and yet no other server is taken for it
    std::shared_ptr<const WindowSnapshot> windows;
    std::chrono::nanoseconds until{0};
};

/// The pins of all threads; few threads walk. Not thread-local, as what a thread has to destroy at its end
/// keeps the library from being unloaded.
struct Pins {
    std::mutex mutex;
    std::vector<Pin> list; // guarded by mutex
};

// While the library is loaded, so that no fork falls into the making.
[[maybe_unused]] const Pins& g_pins = OnePerProcess<Pins>::Get();

bool AreSame(const std::weak_ptr<WindowServer>& one, const std::shared_ptr<WindowServer>& other) {
    return !one.owner_before(other) && !other.owner_before(one);
}

/// Replaces the thread's pin, and lets go of those that don't hold any more.
void Keep(Pin pin) {
    std::vector<Pin> released; // snapshots end behind the lock
    Pins& pins = OnePerProcess<Pins>::Get();
    const auto now = CmSteadyNow();
    const std::lock_guard<std::mutex> lock(pins.mutex);
    const auto past = std::partition(pins.list.begin(), pins.list.end(), [&](const Pin& each) {
        return each.thread != pin.thread && now < each.until;
    });
    released.assign(std::make_move_iterator(past), std::make_move_iterator(pins.list.end()));
    pins.list.erase(past, pins.list.end());
    pins.list.push_back(std::move(pin));
}

/// Null when the calling thread has none.
std::shared_ptr<const WindowSnapshot> PinnedUnder(const std::shared_ptr<WindowServer>& server) {
    Pins& pins = OnePerProcess<Pins>::Get();
    const std::lock_guard<std::mutex> lock(pins.mutex);
    const auto pin = std::find_if(pins.list.begin(), pins.list.end(),
                                  [](const Pin& each) { return each.thread == GetThreadSelfId(); });
    if (pin == pins.list.end() || !AreSame(pin->server, server) || CmSteadyNow() >= pin->until)
        return nullptr;
    return pin->windows;
}

} // namespace

std::shared_ptr<const WindowSnapshot> PinWindows() noexcept {
    const std::shared_ptr<WindowServer> server = WindowServerInUse();
    std::shared_ptr<const WindowSnapshot> windows = server->GetWindows();
    UnpinWindows();
    try {
        Keep({GetThreadSelfId(), server, windows, CmSteadyNow() + LONGEST_PIN});
    } catch (const std::bad_alloc&) { // NOLINT(bugprone-empty-catch): the walk then sees the desktop move
    }
    return windows;
}

void UnpinWindows() noexcept {
    std::shared_ptr<const WindowSnapshot> released; // ends behind the lock
    Pins& pins = OnePerProcess<Pins>::Get();
    const std::lock_guard<std::mutex> lock(pins.mutex);
    const auto pin = std::find_if(pins.list.begin(), pins.list.end(),
                                  [](const Pin& each) { return each.thread == GetThreadSelfId(); });
    if (pin == pins.list.end())
        return;
    released.swap(pin->windows);
    pins.list.erase(pin);
}

std::shared_ptr<const WindowSnapshot> PinnedWindows() noexcept {
    return PinnedUnder(WindowServerInUse());
}

std::shared_ptr<const WindowSnapshot> WindowsForLookUp() noexcept {
    const std::shared_ptr<WindowServer> server = WindowServerInUse();
    if (std::shared_ptr<const WindowSnapshot> pinned = PinnedUnder(server))
        return pinned;
    return server->GetWindows();
}

void ForgetPins() noexcept {
    std::vector<Pin> released;
    Pins& pins = OnePerProcess<Pins>::Get();
    const std::lock_guard<std::mutex> lock(pins.mutex);
    released.swap(pins.list);
}

} // namespace platform
