// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/fork_watch.h"
#include "platform/window_server.h"
#include "platform/x11/display_streams.h"
#include "util/cm_clock.h"

#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <utility>

namespace platform::x11 {

class X11Session;
struct Command;
struct HubState;

/// What look-ups answer from. No pointer is null but the cursor's.
struct View {
    View();

    LifeState life;
    std::shared_ptr<const DisplayList> displays;
    std::shared_ptr<const WindowSnapshot> windows;
    std::shared_ptr<const ApplicationList> applications;
    std::shared_ptr<const CursorImage> cursor;
    std::array<Availability, 7> capabilities{}; ///< By Capability.

    Availability Of(Capability capability) const {
        return capabilities[static_cast<std::size_t>(capability)];
    }
};

/// Where the window server's users and its one thread meet: the state that look-ups answer from, the work
/// that waits for the thread, and what has been told so far.
///
/// Life: connecting gives an epoch; a broken connection is a loss, and the thread tries again after 100 ms,
/// then twice as long each time up to 5 s, until somebody rests or closes. A deadline that passes without an
/// answer makes the server stalled; the thread then asks one thing and is alive again when that is answered.
/// What the first connection finds is nobody's news and is not told.
///
/// Threads: any; one lock, which is never held while the server is waited for.
/// Forking: in a child everything answers as lost, and no lock is touched.
class X11Hub {
public:
    using Nanoseconds = std::chrono::nanoseconds;
    using Work = std::function<void(X11Session& session)>;

    /// In a forked child the last share only forgets. `display`: empty for the variable DISPLAY.
    static std::shared_ptr<X11Hub> Share(std::string display);
    ~X11Hub();
    X11Hub(const X11Hub&) = delete;
    X11Hub& operator=(const X11Hub&) = delete;

    bool InForkedChild() const { return m_forks.InChild(); }

    /// The state now. At rest it starts the thread and waits for it to have connected, or to have failed to.
    View Look();
    // Parts of it.
    LifeState Life();
    Availability Of(Capability capability);
    std::shared_ptr<const DisplayList> Displays();
    std::shared_ptr<const WindowSnapshot> Windows();
    std::shared_ptr<const ApplicationList> Applications();
    std::shared_ptr<const CursorImage> Cursor();
    /// Never waits and starts nothing.
    std::uint64_t Moment() const;

    /// Runs `work` on the thread and waits for it. Ok when it has run; Lost without a server that answers,
    /// and look-ups tell so by then; Timeout when the deadline has passed, which makes the server stalled
    /// unless it was passed before. `work` may still run later, so it owns what it uses; and it may throw
    /// what X11Connection throws.
    PictureOutcome Run(Nanoseconds deadline, Work work);
    /// The same, on the caller's own thread if the thread has nothing to do: no other one has to wake up
    /// then.
    PictureOutcome RunHereOrThere(Nanoseconds deadline, const Work& work);
    void SetReceiver(std::shared_ptr<NoticeReceiver> receiver);
    /// Null unless the server is alive.
    StreamReaderPtr NewReader(const DisplayStreamRequest& request);
    /// What was opened under that epoch is dead.
    bool IsOver(std::uint64_t epoch) const;
    /// No notice of it comes after that.
    void Forget(const StreamReaderPtr& reader);

    void Rest();
    /// The server ends: from now on lost, for streams that are kept.
    void Close();

private:
    explicit X11Hub(std::string display);

    bool AwaitSettled(CCmWaitPoint::Lock& lock, Nanoseconds deadline);
    std::optional<PictureOutcome> WhyNot(CCmWaitPoint::Lock& lock, Nanoseconds deadline);
    PictureOutcome RunThere(CCmWaitPoint::Lock& lock, const std::shared_ptr<Command>& command);
    void AwaitTelling(CCmWaitPoint::Lock& lock, PictureOutcome outcome, std::uint64_t epoch,
                      Nanoseconds deadline);
    template <class Part>
    auto LookAt(Part part) -> decltype(part(std::declval<const View&>()));
    bool StartThread();

    const ForkWatch m_forks;
    const std::string m_display;
    const View m_lost;
    const std::unique_ptr<HubState> m_state;
};

} // namespace platform::x11
