// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/x11/application_watch.h"
#include "platform/x11/standing_moment.h"
#include "platform/x11/x11_hub.h"
#include "platform/x11/x11_memory.h"
#include "util/cm_clock.h"

#include <atomic>
#include <cstdint>
#include <deque>
#include <list>
#include <memory>
#include <mutex>
#include <optional>
#include <vector>

namespace platform::x11 {

class X11Worker;

/// Work for the thread. Guarded by the hub's lock, but for what is told to be constant.
struct Command {
    enum class State {
        Waiting,
        Running,
        Done,
    };

    X11Hub::Work work; // constant
    /// Constant; nothing for work that nobody waits for.
    std::optional<std::chrono::nanoseconds> deadline;
    State state = State::Waiting;
    PictureOutcome outcome = PictureOutcome::Lost;
};
using CommandPtr = std::shared_ptr<Command>;

/// How the work of somebody who has borrowed the connection has ended.
struct Borrowing {
    PictureOutcome outcome = PictureOutcome::Failed;
    bool isUnanswered = false; ///< The server didn't answer in time.
    bool isToBeSeenTo = false; ///< The thread has something to do now.
};

/// Who lends the connection, while he has nothing to do with it.
class ConnectionLender {
public:
    virtual ~ConnectionLender() = default;
    /// Runs the work on the calling thread, to which nobody else may lend it meanwhile. Throws nothing.
    virtual Borrowing RunForBorrower(std::chrono::nanoseconds deadline, const X11Hub::Work& work) = 0;
};

/// What the hub's two sides share: its users' (X11Hub) and its thread's (X11Worker).
/// Threads: any. Operations with a lock need the point's.
struct HubState {
    using Lock = CCmWaitPoint::Lock;

    enum class Phase {
        AtRest,
        Connecting, ///< For the first time since the rest.
        Settled,    ///< Has connected or failed to; the view tells.
    };

    // ---- The users' side

    Phase PhaseNow(const Lock&) const { return m_phase; }
    bool IsClosed(const Lock&) const { return m_closed; }
    const View& Now(const Lock&) const { return m_view; }
    bool IsAlive(const Lock&) const {
        return m_phase == Phase::Settled && m_view.life.life == Life::Alive && !m_closed;
    }
    /// Known to be, so that waiting is of no use.
    bool IsLost(const Lock&) const {
        return m_closed || (m_phase == Phase::Settled && m_view.life.life != Life::Alive);
    }
    std::uint64_t Epoch() const { return m_epoch.load(std::memory_order_relaxed); }

    void Queue(CommandPtr command, const Lock&);
    /// Work that is done in its order as soon as the server answers, and dropped with the connection.
    void Post(X11Hub::Work work, const Lock&);
    void Withdraw(const CommandPtr& command, const Lock&);
    /// Null when the thread needs the connection itself, or somebody else has it. Else it is to be given
    /// back.
    ConnectionLender* Borrow(const Lock&);
    void GiveBack(const Borrowing& borrowing);
    /// Somebody has waited in vain: all who still wait fail.
    void Stall(const Lock&);
    void SetReceiver(std::shared_ptr<NoticeReceiver>& receiver, const Lock&);
    StreamReaderPtr NewReader(const DisplayStreamRequest& request, const Lock&);
    std::vector<StreamReaderPtr> Readers(const Lock&) const { return {m_readers.begin(), m_readers.end()}; }
    void Forget(const StreamReaderPtr& reader, const Lock&) { m_readers.remove(reader); }
    void Close(std::shared_ptr<NoticeReceiver>& receiver, const Lock&);

    /// `wakes` is written to when there is something for the thread; -1 for no thread.
    void BeginPhase(Phase phase, int wakes, const Lock&);

    // ---- The thread's side

    bool IsStalled();
    CommandPtr TakeCommand();
    void Lend(ConnectionLender& lender);
    /// Waits until nobody has borrowed it.
    void TakeBack();
    void Finish(const CommandPtr& command, PictureOutcome outcome);
    /// A session has begun, and `view` is what it has found. `sameServer`: as far as the server can tell, it
    /// is the one that there was before the rest.
    void OnConnected(View view, bool sameServer);
    /// The lists, the cursor and the capabilities of `view`, whose life is not looked at.
    void Publish(const View& view);
    void OnLost();
    void OnStalled();
    void OnAnswering();
    void OnStreamPicture(std::uint64_t stream);
    /// Those of the epoch.
    std::vector<StreamReaderPtr> LivingReaders();

    CCmWaitPoint point;
    StandingMoment moment;             // its lock is taken after the others
    std::mutex threadMutex;            // taken before the point's
    std::shared_ptr<X11Worker> thread; // guarded by threadMutex

    // Of the thread, or of nobody while there is none.
    Memory memory;
    ApplicationWatch applications;

private:
    void SetLife(Life life);
    void Wake();
    void FailAwaitedCommands();
    void FailCommands();
    void LoseNow(std::uint64_t generation);
    void PublishNow(const View& view);
    void Tell(const Notice& notice);
    void Tell(NoticeKind kind);

    // Guarded by the point's mutex.
    Phase m_phase = Phase::AtRest;
    View m_view;
    bool m_introduced = false; // the first try to connect is over
    bool m_closed = false;
    ApplicationList m_knownApplications; // whose launch was told, and not their end
    std::deque<CommandPtr> m_commands;
    std::list<StreamReaderPtr> m_readers;
    std::uint64_t m_lastReader = 0;
    std::shared_ptr<NoticeReceiver> m_receiver;
    int m_wakes = -1;
    ConnectionLender* m_lender = nullptr;
    bool m_isBorrowed = false;
    bool m_isAwaitedBack = false;

    std::atomic<std::uint64_t> m_epoch{0};
};

} // namespace platform::x11
