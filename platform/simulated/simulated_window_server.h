// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/simulated/operation_script.h"
#include "platform/simulated/simulated_desktop.h"
#include "platform/simulated/simulated_lie.h"
#include "platform/window_server.h"

#include <sys/types.h>
#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>

namespace platform {

class Desk;

/// A desktop in memory that does what a script tells it. Nothing happens on it by itself but what contents
/// that move show, and a manual clock moves those; so the same script gives the same answers.
///
/// The script's side: every change shows at once and raises the notices that a real server raises, unless the
/// server is stalled or lost; then it tells when it answers again or returns. Operations that name something
/// that isn't there change nothing and give false. They may throw std::bad_alloc, and they trace nothing.
///
/// Threads:  any, on both sides, several at once. It has a thread of its own only while something is to be
///           told later: to readers of what moves or comes too fast for them, or the end of a stall.
/// Time:     everything follows CmSteadyNow.
/// Lifetime: what it gives out outlives it; its streams answer Gone after it.
class SimulatedWindowServer final : public WindowServer {
public:
    /// Without a desktop there is no display, no window and no pointer.
    explicit SimulatedWindowServer(SimulatedDesktop desktop = {});
    ~SimulatedWindowServer() override;
    SimulatedWindowServer(const SimulatedWindowServer&) = delete;
    SimulatedWindowServer& operator=(const SimulatedWindowServer&) = delete;

    // ---- The script: anything

    /// Several changes in one moment. `change` runs under the server's lock, so it calls no server and moves
    /// no clock. What has the id 0 after it is given one; the main display becomes the origin.
    void Change(const std::function<void(SimulatedDesktop& desktop)>& change);

    /// Another desktop altogether. Windows and displays that have the same id are the same ones.
    void Show(SimulatedDesktop desktop);

    // ---- The script: displays

    /// The id, 0 if there is a display of that id. The first one becomes the main one.
    CGDirectDisplayID AddDisplay(SimulatedDisplay display);
    bool RemoveDisplay(CGDirectDisplayID display);
    /// Moving the main display moves all others the other way, since it is the origin.
    bool MoveDisplay(CGDirectDisplayID display, CGPoint origin);
    bool ResizeDisplay(CGDirectDisplayID display, CGSize size);
    bool ScaleDisplay(CGDirectDisplayID display, float scale);
    bool ReserveEdges(CGDirectDisplayID display, SimulatedEdges reserved);
    bool SetMainDisplay(CGDirectDisplayID display);
    bool SetBackground(CGDirectDisplayID display, SimulatedContent background);
    /// The display is gone as one of its own while it mirrors another; 0 ends that.
    bool MirrorDisplay(CGDirectDisplayID display, CGDirectDisplayID mirrored);

    // ---- The script: windows

    /// The id, 0 if a window has or had that id. It stands at the front of its level.
    CGWindowID AddWindow(SimulatedWindow window);
    bool CloseWindow(CGWindowID window);
    bool MoveWindow(CGWindowID window, CGPoint origin);
    bool SetFrame(CGWindowID window, const CGRect& frame);
    bool SetContent(CGWindowID window, SimulatedContent content);
    bool SetTitle(CGWindowID window, std::string title);
    bool SetOwner(CGWindowID window, pid_t owner);
    /// It comes to the front of that level.
    bool SetLevel(CGWindowID window, int level);
    bool SetAlpha(CGWindowID window, float alpha);
    bool SetSharing(CGWindowID window, SharingState sharing);
    bool SetOnScreen(CGWindowID window, bool onScreen);
    bool SetShadow(CGWindowID window, SimulatedEdges shadow);
    /// Whether owner, level and sharing state have been found out; see SimulatedWindow::known.
    bool SetKnown(CGWindowID window, bool known);
    /// Within its level.
    bool RaiseWindow(CGWindowID window);
    bool LowerWindow(CGWindowID window);
    /// Right above another window, whatever the levels.
    bool PutWindowAbove(CGWindowID window, CGWindowID below);

    // ---- The script: applications, pointer, cursor

    /// False if a running application has that pid.
    bool StartApplication(ApplicationInfo application);
    /// Its windows go with it.
    bool EndApplication(pid_t pid);
    /// Nothing: the position can't be known.
    void SetPointer(std::optional<CGPoint> position);
    /// A different cursor gets another serial.
    void SetCursor(std::optional<SimulatedCursor> cursor);

    // ---- The script: what the server can, and its life

    void SetPermission(Permission permission);
    /// AfterPermission becomes Yes with the permission. A server that can't list windows lists displays.
    void SetCapability(Capability capability, Availability availability);
    /// Which streams there are.
    void SetPointerModes(bool without, bool with);
    /// Whether it tells moments; at first it doesn't, so that every capture makes the calls that a script
    /// counts.
    void TellMoments(bool tells);
    /// For so long, pictures of displays may still show the stack before a change.
    void SetPictureLag(std::chrono::nanoseconds lag);

    /// Answers nothing until Answer: what waits fails, look-ups give the last state.
    void Stall();
    void Answer();
    void Lose();
    /// After a loss: a new epoch, the same ids.
    void FindAgain();

    // ---- The script: failures, delays, counts

    /// What a failure is: a look-up gives nothing, GetLife Lost, GetCapability No, GetPermission Denied,
    /// BringToFront false, and a picture or stream the outcome. AskPermission asks nobody. SetNoticeReceiver
    /// and Rest can't fail. A stream that is gone stays gone.
    void FailNext(SimulatedOperation operation, PictureOutcome outcome = PictureOutcome::Failed);
    /// The Nth call from now on and no other; 1 is the next one.
    void FailNth(SimulatedOperation operation, unsigned nth, PictureOutcome outcome = PictureOutcome::Failed);
    void FailAlways(SimulatedOperation operation, PictureOutcome outcome = PictureOutcome::Failed);

    /// Has calls take so long. One that would take longer than its deadline, or the pointer's 100 ms, fails
    /// then, and the server is stalled until its answer would have come. Other look-ups just take long.
    void DelayNext(SimulatedOperation operation, std::chrono::nanoseconds delay);
    void DelayAlways(SimulatedOperation operation, std::chrono::nanoseconds delay);

    /// Runs `action` in the Nth call from now on, before anything else and with no lock held, on the caller's
    /// thread. It may change the desktop.
    void DoAt(SimulatedOperation operation, unsigned nth, std::function<void()> action);

    /// No more failures, delays and actions for that operation.
    void Heal(SimulatedOperation operation);

    /// Calls so far, failed ones among them.
    unsigned CallsOf(SimulatedOperation operation) const;

    /// Breaks the contract; see SimulatedLie.
    void Lie(SimulatedLie lie, bool tells = true);

    // ---- WindowServer

    const char* Name() const override;
    LifeState GetLife() const override;
    Availability GetCapability(Capability capability) const override;
    Permission GetPermission() const override;
    /// NotAsked becomes Asking; SetPermission is the answer.
    void AskPermission() override;
    void SetNoticeReceiver(std::shared_ptr<NoticeReceiver> receiver) override;
    std::shared_ptr<const DisplayList> GetDisplays() const override;
    std::shared_ptr<const WindowSnapshot> GetWindows() const override;
    std::shared_ptr<const ApplicationList> GetApplications() const override;
    bool GetPointerPosition(CGPoint& position) const override;
    std::shared_ptr<const CursorImage> GetCursor() const override;
    /// No operation that a script can count or have fail.
    std::uint64_t GetMoment() const override;
    WindowPictureResult TakeWindowPicture(const WindowPictureRequest& request) override;
    DisplayStreamResult OpenDisplayStream(const DisplayStreamRequest& request) override;
    void Rest() override;
    bool BringToFront(pid_t pid) override;

private:
    template <class Fn>
    bool ChangeDisplay(CGDirectDisplayID id, const Fn& change);
    template <class Fn>
    bool ChangeWindow(CGWindowID id, const Fn& change);
    DisplayStreamResult OpenStream(const DisplayStreamRequest& request);

    // Made once, so that nothing has to be made where nothing can be had.
    const std::shared_ptr<const DisplayList> m_noDisplays = std::make_shared<DisplayList>();
    const std::shared_ptr<const WindowSnapshot> m_noWindows = std::make_shared<WindowSnapshot>();
    const std::shared_ptr<const ApplicationList> m_noApplications = std::make_shared<ApplicationList>();

    const std::shared_ptr<Desk> m_desk;
};

} // namespace platform
