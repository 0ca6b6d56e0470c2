// SPDX-License-Identifier: Apache-2.0
#include "platform/window_server.h"

#include "platform/none/none_window_server.h"
#include "platform/notices.h"
#include "platform/simulated/scene.h"
#include "platform/simulated/simulated_window_server.h"
#include "platform/window_server_choice.h"
#include "platform/x11/x11_window_server.h"
#include "util/cm_never_destroyed.h"

#include <pthread.h>

#include <algorithm>
#include <atomic>
#include <utility>

namespace platform {

namespace {

std::shared_ptr<WindowServer> MakeNone() {
    return std::make_shared<NoneWindowServer>();
}

std::shared_ptr<WindowServer> MakeSimulated() {
    return std::make_shared<SimulatedWindowServer>(DefaultScene());
}

std::shared_ptr<WindowServer> MakeX11() {
    return std::make_shared<X11WindowServer>();
}

std::shared_ptr<WindowServer> MakeWhatIsSeen() {
    std::shared_ptr<WindowServer> seen = MakeX11WindowServerIfSeen();
    return seen != nullptr ? seen : MakeNone();
}

constexpr WindowServerMaker MAKERS[] = {
    {"auto", MakeWhatIsSeen},
    {"none", MakeNone},
    {"simulated", MakeSimulated},
    {"x11", MakeX11},
};

/// Never destroyed: threads may ask for the window server while the process takes its statics down.
WindowServerChoice& ChoiceOfProcess() {
    struct FromMakers : WindowServerChoice {
        FromMakers() : WindowServerChoice(MAKERS, MakeNone()) {}
    };
    static const CCmNeverDestroyed<FromMakers> choice;
    return *choice;
}

int BeReadyForForks() {
    return pthread_atfork([] { ChoiceOfProcess().BeforeFork(); },
                          [] { ChoiceOfProcess().AfterForkInParent(); },
                          [] { ChoiceOfProcess().AfterForkInChild(); });
}

// Both as soon as the library is loaded, so that nothing is left to a moment without memory.
[[maybe_unused]] const WindowServerChoice& g_choice = ChoiceOfProcess();
[[maybe_unused]] const int g_forkHandlers = BeReadyForForks();

} // namespace

std::uint64_t NewMoment() noexcept {
    static std::atomic<std::uint64_t> last{0};
    return ++last;
}

WindowSnapshot::WindowSnapshot(std::uint64_t generation, std::vector<WindowInfo> frontFirst)
    : m_generation(generation),
      m_windows(std::move(frontFirst)) {
    m_index.reserve(m_windows.size());
    for (std::size_t place = 0; place < m_windows.size(); ++place)
        m_index.emplace_back(m_windows[place].id, place);
    std::sort(m_index.begin(), m_index.end());
}

const WindowInfo* WindowSnapshot::Find(CGWindowID id) const {
    // Of equal ids the one with the lowest place, which is the front one.
    const auto found = std::lower_bound(m_index.begin(), m_index.end(), std::pair(id, std::size_t{0}));
    return found != m_index.end() && found->first == id ? &m_windows[found->second] : nullptr;
}

std::shared_ptr<WindowServer> CurrentWindowServer() {
    return ChoiceOfProcess().Current();
}

std::shared_ptr<WindowServer> ReplaceWindowServer(std::shared_ptr<WindowServer> server) {
    std::shared_ptr<WindowServer> former = ChoiceOfProcess().Replace(std::move(server));
    FollowWindowServer();
    return former;
}

std::shared_ptr<WindowServer> ChosenWindowServer() {
    return ChoiceOfProcess().Chosen();
}

} // namespace platform
