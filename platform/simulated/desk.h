// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/fork_watch.h"
#include "platform/simulated/desktop_painter.h"
#include "platform/simulated/operation_script.h"
#include "platform/simulated/simulated_desktop.h"
#include "platform/simulated/simulated_lie.h"
#include "util/cm_clock.h"

#include <sys/types.h>
#include <atomic>
#include <chrono>
#include <cstdint>
#include <functional>
#include <limits>
#include <list>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <set>
#include <utility>
#include <vector>

class ACmThread;

namespace platform {

/// Which window stands for a display where no windows can be listed.
constexpr CGWindowID WindowOfDisplay(CGDirectDisplayID display) {
    return display ^ 0x80000000U;
}

/// The insides of a simulated window server: the desktop as it is, what has been told of it, and all that is
/// asked and taken. The server and its streams share it.
///
/// What is told follows from the difference between the desktop and what was told before: so it is with a
/// change, with an answer after a stall, with a loss and with a return.
///
/// Threads: any; one lock. A thread of its own runs only while something is to be told at a later time.
/// Forking: in a child nothing is touched, whoever held the lock; see Share.
class Desk { // NOLINT(clang-analyzer-optin.performance.Padding): one a server, its members by subject
public:
    using Nanoseconds = std::chrono::nanoseconds;
    using Lock = CCmWaitPoint::Lock;

    /// What Picture tells of the stack.
    struct ShownStacks {
        std::uint64_t before = 0;
        std::uint64_t after = 0;

        bool operator==(const ShownStacks&) const = default;
    };

    /// A reader of a display, which its stream and the desk share. Guarded by the lock.
    struct Reader {
        std::uint64_t id = 0;
        DisplayStreamRequest request;
        Nanoseconds period{0};
        bool gone = false;
        bool told = false;               // that there is something new, which it hasn't taken yet
        std::optional<Nanoseconds> took; // when it took its last picture
        SimulatedPixelsPtr pixels;       // of that picture
        ShownStacks stacks;              // of that picture
        std::uint64_t looked = 0;        // the looks, and the time, for which nothing new was found
        Nanoseconds lookedElapsed{0};
    };

    /// What one call has come to: the lock, and whether it may go on.
    struct Entry {
        Lock lock;
        PictureOutcome outcome = PictureOutcome::Ok;

        bool Fails() const { return outcome != PictureOutcome::Ok; }
    };

    /// In a forked child the last share only forgets: it destroys nothing and waits for nobody.
    static std::shared_ptr<Desk> Share(SimulatedDesktop desktop);

    explicit Desk(SimulatedDesktop desktop);
    ~Desk();
    Desk(const Desk&) = delete;
    Desk& operator=(const Desk&) = delete;

    /// True in a process forked from the one that made it. Whoever reads it there answers as a lost server
    /// and goes no further.
    bool InForkedChild() const { return m_forks.InChild(); }

    // ---- The script's side

    void Change(const std::function<void(SimulatedDesktop&)>& change);
    /// 0 for an id that a window has or had.
    CGWindowID AddWindow(SimulatedWindow window);
    CGDirectDisplayID AddDisplay(SimulatedDisplay display);
    /// Does nothing in another life than `from`, if that is given.
    void ChangeLife(std::optional<Life> from, Life to);
    void SetPermission(Permission permission);
    void SetCapability(Capability capability, Availability availability);
    void SetPointerModes(bool without, bool with);
    void SetPictureLag(Nanoseconds lag);
    void SetLie(SimulatedLie lie, bool tells);
    OperationScript& Script() { return m_script; }
    void TellMoments(bool tells);

    // ---- The server's side

    /// A look-up comes in. One that the script delays beyond `limit` fails then, and the server stalls.
    Entry Enter(SimulatedOperation operation, Nanoseconds limit = Nanoseconds::max());
    /// An operation that waits for the desktop comes in.
    Entry EnterWaiting(SimulatedOperation operation, Nanoseconds deadline);

    // With the lock of an entry.
    LifeState GetLife(const Lock&) const { return m_life; }
    Availability GetCapability(Capability capability, const Lock&) const {
        return AvailabilityOf(capability);
    }
    Permission GetPermission(const Lock&) const { return m_permission; }
    void AskPermission(const Lock&);
    std::shared_ptr<const DisplayList> GetDisplays(const Lock&) const { return m_displays; }
    std::shared_ptr<const WindowSnapshot> GetWindows(const Lock&) const { return m_windows; }
    std::shared_ptr<const ApplicationList> GetApplications(const Lock&) const { return m_applications; }
    std::optional<CGPoint> GetPointer(const Lock&) const;
    std::uint64_t GetMoment() const;
    std::shared_ptr<const CursorImage> GetCursor(const Lock&) const;
    WindowPictureResult TakeWindowPicture(const WindowPictureRequest& request, const Lock&);
    bool BringToFront(pid_t pid, const Lock&);
    PictureOutcome OpenReader(const DisplayStreamRequest& request, std::shared_ptr<Reader>& opened,
                              const Lock&);

    std::uint64_t Epoch() const { return m_epoch.load(std::memory_order_relaxed); }
    void SetReceiver(std::shared_ptr<NoticeReceiver> receiver);
    DisplayPictureResult TakeNewest(Reader& reader, Nanoseconds deadline);
    void Close(const std::shared_ptr<Reader>& reader);
    /// Starts the thread if there is something for it to do.
    void Wake() noexcept;
    void Rest();
    /// The server ends; streams that are kept answer Gone.
    void Close();

private:
    class Thread;

    /// What a display looks like for a while.
    struct Looks {
        std::uint64_t looks = 0;
        Nanoseconds from{0}; // since the beginning
        std::optional<Nanoseconds> until;
        SimulatedPixelsPtr pixels;
    };

    CGWindowID FreshWindowId() const;

    // Entering.
    void Perform(const std::vector<std::function<void()>>& actions);
    void CatchUp();
    /// Until the time of the answer. False when that is too late.
    bool WaitForAnswer(Lock& lock, Nanoseconds answer, Nanoseconds deadline);
    void StallUntil(Nanoseconds answer);

    // What has been told, and is told now.
    void Settle();
    void Publish();
    void PublishDisplays();
    void PublishWindows();
    void PublishApplications();
    void PublishCursor();
    void SetLifeNow(Life life);
    void Tell(const Notice& notice);
    void Tell(NoticeKind kind);
    bool IsAvailable(Capability capability) const { return AvailabilityOf(capability) == Availability::Yes; }
    Availability AvailabilityOf(Capability capability) const;
    bool HasPermission() const;
    std::vector<WindowInfo> ListWindows() const;
    bool Tells(SimulatedLie lie) const { return m_lies.count(lie) != 0; }

    // Pictures.
    DesktopPainter::Moment Now() const;
    std::optional<PictureOutcome> CannotTakeWindows(const WindowPictureRequest& request) const;
    std::vector<PictureLayer> DisplayLayers(const std::vector<CGWindowID>& windows, const CGRect& rect);
    std::vector<PictureLayer> WindowLayers(const std::vector<CGWindowID>& windows,
                                           const WindowPictureRequest& request);
    std::vector<CGWindowID> Existing(const std::vector<CGWindowID>& windows) const;
    CGWindowID FrontUnlisted(const std::vector<CGWindowID>& windows) const;
    std::uint64_t OldestGenerationShown() const;
    std::uint64_t MomentNow() const;

    // Streams.
    bool IsListed(CGDirectDisplayID display) const;
    const SimulatedDisplay* DisplayOf(const Reader& reader) const;
    SimulatedPixelsPtr Look(const Reader& reader);
    PictureOutcome TakePicture(Reader& reader, PicturePtr& picture);
    ShownStacks StacksNow() const { return {OldestGenerationShown(), m_generation}; }
    Picture MakeStreamPicture(const Reader& reader, const SimulatedPixels& newest) const;
    std::optional<Nanoseconds> DueTime(const Reader& reader) const;
    std::optional<Nanoseconds> NextMotion(Nanoseconds elapsed) const;
    std::optional<Nanoseconds> NextDue() const;
    SimulatedPixelsPtr FindNew(Reader& reader);
    bool MayFindNew(Reader& reader);
    void EndReaders();
    void TellReaders();
    int RunThread(const ACmThread& thread);

    const ForkWatch m_forks;
    const Nanoseconds m_beginning;
    OperationScript m_script;
    std::atomic<std::uint64_t> m_epoch{1};

    mutable CCmWaitPoint m_point;
    // Guarded by the point's mutex.
    SimulatedDesktop m_desktop;
    std::set<CGWindowID> m_usedIds;
    LifeState m_life{Life::Alive, 1};
    std::optional<Nanoseconds> m_stallEnds;
    Permission m_permission = Permission::NotNeeded;
    std::map<Capability, Availability> m_capabilities; // those that aren't Yes
    bool m_withoutPointer = true;
    bool m_withPointer = true;
    Nanoseconds m_lag{0};
    std::set<SimulatedLie> m_lies;
    bool m_closed = false;
    std::shared_ptr<NoticeReceiver> m_receiver;
    // What has been told.
    std::shared_ptr<const DisplayList> m_displays = std::make_shared<DisplayList>();
    std::shared_ptr<const WindowSnapshot> m_windows =
        std::make_shared<WindowSnapshot>(1, std::vector<WindowInfo>());
    std::shared_ptr<const ApplicationList> m_applications = std::make_shared<ApplicationList>();
    ApplicationList m_knownApplications; // those whose launch was told, and not their end
    std::optional<CGPoint> m_pointer;
    std::optional<SimulatedCursor> m_cursorSource;
    std::shared_ptr<const CursorImage> m_cursorImage; // also while it can't be had
    std::shared_ptr<const CursorImage> m_cursor;
    std::uint64_t m_generation = 1;
    std::vector<WindowInfo> m_stack;                                  // of that generation
    std::vector<SimulatedWindow> m_formerWindows;                     // before the last change of the stack
    std::vector<std::pair<Nanoseconds, std::uint64_t>> m_generations; // since when, oldest first
    // Pictures.
    DesktopPainter m_painter;
    std::uint64_t m_looks = 0;            // grows when something may look different
    std::uint64_t m_moment = NewMoment(); // another one with each change
    bool m_tellsMoments = false;
    std::map<std::pair<CGDirectDisplayID, bool>, Looks> m_seen; // by display and pointer
    std::list<std::shared_ptr<Reader>> m_readers;
    std::uint64_t m_lastReader = 0;
    std::uint64_t m_lastSerial = 0;

    std::atomic<bool> m_threadWanted{false};
    std::mutex m_threadMutex; // taken before the point's
    std::shared_ptr<Thread> m_thread;
};

} // namespace platform
