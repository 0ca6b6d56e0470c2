// SPDX-License-Identifier: Apache-2.0
#include "tests/privacy/delivered_history.h"

#include "platform/core_graphics.h"
#include "platform/dispatch_pool.h"
#include "src/mac/share_util_mac.h"
#include "src/share_util.h"
#include "util/cm_clock.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <utility>

namespace {

using namespace std::chrono_literals;
using platform::SimulatedLie;
using platform::SimulatedOperation;

constexpr int WIDTH = 200;
constexpr int HEIGHT = 120;
constexpr int APPS = 4;
constexpr std::size_t MOST_WINDOWS = 14;

void LieAsTheFaultHasIt(DeliveredFault fault, platform::SimulatedWindowServer& server) {
    switch (fault) {
        case DeliveredFault::OneLayerTooMany:
            server.Lie(SimulatedLie::OneWindowTooMany);
            break;
        case DeliveredFault::UnsharedShown:
            server.Lie(SimulatedLie::UnsharedShown);
            break;
        case DeliveredFault::OldPixelsKept:
            server.Lie(SimulatedLie::OldPixelsKept);
            break;
        case DeliveredFault::WrongRectangle:
            server.Lie(SimulatedLie::WrongRectangle);
            break;
        default:
            break;
    }
}

} // namespace

// ---- The beginning

DeliveredHistory::DeliveredHistory(const DeliveredKind& kind, DeliveredFault fault, unsigned seed)
    : m_kind(kind),
      m_fault(fault),
      m_random(seed),
      m_tellsMoments(seed % 2 == 0),
      m_server(dynamic_cast<platform::SimulatedWindowServer*>(&m_desk.Desk().Server())),
      m_paced(std::make_shared<CPacedWindowServer>(ServerOfSessions())) {
    Prepare();
    m_client.sink.SetFrameHook([this](IShareFrame* frame) { Look(*frame); });
    m_client.Start();
}

DeliveredHistory::~DeliveredHistory() {
    EXPECT_EQ(m_client->Stop(), 0);
}

void DeliveredHistory::Prepare() {
    ConformanceDesk& desk = m_desk.Desk();
    LieAsTheFaultHasIt(m_fault, *m_server);
    m_server->TellMoments(m_tellsMoments);
    if (!m_kind.IsOfSession())
        m_script->Fail(platform::AVCaptureOperation::SessionInit, 1, platform::AVCaptureScript::ALL);
    else if (Chance(40))
        m_server->SetPictureLag(300ms); // as under a compositor
    desk.MovePointer({-100, -100});
    desk.ChangeCursor(); // one without red
    m_side = desk.AddDisplay({100, 60}).value_or(0);
    for (int i = 0; i < APPS; ++i)
        m_apps.push_back({desk.StartApplication("App").value_or(0)});
    if (Chance(60))
        Open(0, {{0, 0}, {WIDTH, HEIGHT}});
    if (Chance(60))
        Open(0, {{WIDTH, 0}, {100, 60}});
    for (int i = Number(2, 6); i > 0; --i)
        Open(static_cast<std::size_t>(Number(0, APPS - 1)), SomeFrame());
    EXPECT_EQ(m_client->SetCaptureMode(m_kind.mode), 0);
    EXPECT_EQ(m_client->SetAppShareBackgroundColor(0), 0);
    if (m_kind.IsOfDesktop()) {
        EXPECT_EQ(m_client->SelectSharedDisplay(platform::CGMainDisplayID()), 0);
        KeepOut(m_apps[1], true);
        return;
    }
    if (m_kind.IsOfWindows()) {
        for (std::size_t i = 0; i < 2; ++i)
            Decide(m_windows[i], Verdict::Shared);
        return;
    }
    for (App& app : m_apps)
        app.isKeptOut = true; // until it is shared
    for (Window& window : m_windows)
        Paint(window);
    for (std::size_t i = 0; i < 2; ++i)
        KeepOut(m_apps[i], false);
}

void DeliveredHistory::ExpectDone(int result) const {
    if (m_fault == DeliveredFault::None || m_fault == DeliveredFault::OneLayerTooMany) {
        EXPECT_EQ(result, 0);
    }
}

platform::CGRect DeliveredHistory::SomeFrame() {
    return {{static_cast<float>(Number(-20, WIDTH + 80)), static_cast<float>(Number(-10, HEIGHT - 10))},
            {static_cast<float>(Number(8, 120)), static_cast<float>(Number(8, 80))}};
}

DeliveredHistory::Window* DeliveredHistory::SomeWindow() {
    return m_windows.empty()
               ? nullptr
               : &m_windows[static_cast<std::size_t>(Number(0, static_cast<int>(m_windows.size()) - 1))];
}

std::string DeliveredHistory::LastSteps() const {
    constexpr std::size_t MANY = 40;
    std::string text;
    for (std::size_t i = m_told.size() - std::min(m_told.size(), MANY); i < m_told.size(); ++i)
        text += "\n    " + m_told[i];
    return text;
}

// ---- A step

void DeliveredHistory::Step() {
    ClosePopups();
    for (int i = Number(1, 3); i > 0; --i)
        Change();
    const std::chrono::milliseconds time(
        std::vector<int>{100, 250, 600, 600, 1100}[static_cast<std::size_t>(Number(0, 4))]);
    ++m_step;
    const bool isDisturbed = m_fault == DeliveredFault::None && Chance(25);
    Take(time, isDisturbed);
    if (m_kind.IsOfDesktop() && !m_kind.IsOfSession())
        return;
    // What has moved has to be at rest before it is captured.
    Take(600ms, isDisturbed && Chance(50));
    Take(600ms, false);
}

/// Lets time pass, and a frame be taken at the end of it.
void DeliveredHistory::Take(std::chrono::milliseconds time, bool isDisturbed) {
    Tell("run " + std::to_string(time.count()));
    if (!isDisturbed && Chance(10)) {
        Tell("ask for thumbnails beside it");
        AskForSome(m_kind.IsOfSession(), {});
    }
    if (m_kind.IsOfSession()) {
        TakeWithSamples(time, isDisturbed);
    } else {
        Expect(time, isDisturbed);
        m_desk.Run(*m_client, time);
        platform::RestPool(); // captures that were begun in it
    }
    if (m_thumbnails != nullptr)
        TakeThumbnails();
    Calm();
}

/// Notes what a frame will show that is taken so much later.
void DeliveredHistory::Expect(std::chrono::milliseconds later, bool isDisturbed) {
    platform::CGPoint pointer;
    const bool hasPointer = m_server->GetPointerPosition(pointer) && pointer.x >= 0;
    const unsigned stamp = ShareUtil::GetCaptureFrameTimeStamp() + static_cast<unsigned>(later.count());
    {
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_taken[stamp] = {{}, m_step, isDisturbed, hasPointer};
    }
    NoteMoment(stamp);
    if (isDisturbed)
        Disturb(stamp);
}

void DeliveredHistory::NoteMoment(unsigned stamp) {
    PrivacyMoment moment = Moment();
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_taken[stamp].moments.push_back(std::move(moment));
}

void DeliveredHistory::Change() {
    const int dice = Number(1, 100);
    if (dice <= 52)
        ChangeWindow();
    else if (dice <= 54)
        ChangeApplication();
    else if (dice <= 74)
        ChangeWhatIsKeptOut();
    else if (dice <= 88)
        ChangeShare();
    else if (dice <= 93)
        ChangeDisplays();
    else
        AskForThumbnails();
}

void DeliveredHistory::ChangeWindow() {
    m_windowsChanged = CmSteadyNow();
    Window* const window = SomeWindow();
    const int what = Number(0, 12);
    if (window != nullptr && (what > 2 || m_windows.size() >= MOST_WINDOWS)) {
        Change(*window, what);
        return;
    }
    const auto app = static_cast<std::size_t>(Number(0, APPS - 1));
    if (what == 0)
        Open(app, SomeFrame());
    else
        PopUp(app);
}

void DeliveredHistory::Change(Window& window, int what) {
    ConformanceDesk& desk = m_desk.Desk();
    const platform::CGRect frame = SomeFrame();
    const std::string name = std::to_string(window.id);
    switch (what) {
        case 0:
        case 1:
        case 2:
        case 3:
            Close(static_cast<std::size_t>(&window - m_windows.data()));
            break;
        case 4:
            Tell("raise " + name);
            desk.Raise(window.id);
            break;
        case 5:
            Tell("minimise " + name);
            desk.Minimise(window.id);
            break;
        case 6:
        case 7:
            Tell("restore " + name);
            desk.Restore(window.id);
            break;
        case 8:
            Tell("let " + name + " float");
            desk.Float(window.id);
            break;
        case 9:
            Tell("fade " + name);
            desk.SetAlpha(window.id, Chance(50) ? 1.0F : 0.5F);
            break;
        case 10:
            Tell("paint " + name);
            window.rgb = NextColour();
            Paint(window);
            break;
        default:
            Tell("move " + name + " to " + ShareUtilMac::CGRectToString(frame));
            desk.SetFrame(window.id, frame);
    }
}

/// One ends with all its windows, and another one is started.
void DeliveredHistory::ChangeApplication() {
    // Where nothing at all would be left to share, a share has nothing to show.
    const auto index = static_cast<std::size_t>(Number(m_kind.IsOfApplications() ? 1 : 0, APPS - 1));
    Tell("end application " + std::to_string(index) + " and start another");
    m_windows.erase(std::remove_if(m_windows.begin(), m_windows.end(),
                                   [index](const Window& each) { return each.app == index; }),
                    m_windows.end());
    m_desk.Desk().EndApplication(m_apps[index].pid);
    m_apps[index] = {m_desk.Desk().StartApplication("App").value_or(0), m_kind.IsOfApplications()};
}

void DeliveredHistory::ChangeWhatIsKeptOut() {
    Window* const window = SomeWindow();
    const int what = Number(0, 9);
    if (what <= 3) {
        App& app = m_apps[static_cast<std::size_t>(Number(0, APPS - 1))];
        KeepOut(app, !app.isKeptOut);
    } else if (window != nullptr && what <= 8) {
        Decide(*window, OtherVerdict(*window));
    } else if (window != nullptr) {
        Tell("have the server keep the pixels of " + std::to_string(window->id));
        window->isSecretOfServer = true;
        Paint(*window);
        m_desk.Desk().Unshare(window->id);
    }
}

void DeliveredHistory::ChangeShare() {
    bool isOn = true;
    switch (Number(0, 6)) {
        case 0:
            m_isPaused = !m_isPaused;
            Tell(m_isPaused ? "pause" : "resume");
            EXPECT_EQ(m_isPaused ? m_client->Pause() : m_client->Resume(), 0);
            break;
        case 1:
            Tell("change the rate");
            m_client->SetCaptureFps(static_cast<unsigned>(Number(1, 6) * 5));
            break;
        case 2:
            Tell("small frames");
            m_client->SetCaptureMaxFrameSize(static_cast<unsigned>(Number(20, 150)),
                                             static_cast<unsigned>(Number(20, 90)));
            break;
        case 3:
            Tell("large frames");
            m_client->SetCaptureMaxFrameSize(1920, 1080);
            break;
        case 4:
            Tell("ask for a frame");
            m_client->Config(SHARE_CAPTURE_ENGINE_CONFIG_FORCE_FRAME, &isOn, sizeof(isOn));
            break;
        case 5:
            Tell("move the pointer");
            m_desk.Desk().MovePointer(Chance(50) ? platform::CGPoint{-100, -100} : platform::CGPoint{50, 40});
            break;
        default:
            m_isInAnotherMode = !m_isInAnotherMode;
            Tell("change the mode");
            m_client->SetCaptureMode(m_isInAnotherMode ? OtherMode() : m_kind.mode);
    }
    m_desk.Run(*m_client, 0ms);
    TakeBackWhatIsNotToLast();
}

/// Neither a pause nor another mode is to last for the rest of a history.
void DeliveredHistory::TakeBackWhatIsNotToLast() {
    if (m_isPaused && Chance(50)) {
        m_isPaused = false;
        Tell("resume");
        EXPECT_EQ(m_client->Resume(), 0);
    }
    if (m_isInAnotherMode && Chance(60)) {
        m_isInAnotherMode = false;
        Tell("change the mode back");
        EXPECT_EQ(m_client->SetCaptureMode(m_kind.mode), 0);
        // While the capturer is replaced nothing can be taken off these shares, and the client is told so.
        if (!m_kind.IsOfDesktop())
            m_desk.Run(*m_client, 0ms);
    }
}

/// One that works or, beside the pictures of windows of a desktop, a session that can't be had.
SCREEN_CAPTURER_TYPE DeliveredHistory::OtherMode() {
    if (m_kind.IsOfSession() && Chance(50))
        return m_kind.mode == SCREEN_CAPTURER_TYPE_AVFOUNDATION ? SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX
                                                                : SCREEN_CAPTURER_TYPE_AVFOUNDATION;
    if (m_kind.IsOfDesktop() && !m_kind.IsOfSession() && Chance(50))
        return SCREEN_CAPTURER_TYPE_AVFOUNDATION;
    return m_kind.IsQueued() ? SCREEN_CAPTURER_TYPE_DEFAULT : SCREEN_CAPTURER_TYPE_CGS_GCD;
}

void DeliveredHistory::ChangeDisplays() {
    ConformanceDesk& desk = m_desk.Desk();
    switch (Number(0, 3)) {
        case 0:
            Tell(m_isPlugged ? "unplug" : "plug in");
            m_isPlugged ? desk.Unplug(m_side) : desk.PlugInAgain(m_side);
            m_isPlugged = !m_isPlugged;
            break;
        case 1:
            Tell("share the side display");
            m_client->SelectSharedDisplay(m_side);
            break;
        case 2:
            Tell("resize the main display");
            m_wasResized = true;
            desk.Resize(platform::CGMainDisplayID(),
                        Chance(60) ? platform::CGSize{WIDTH, HEIGHT} : platform::CGSize{160, 90});
            break;
        default:
            Tell("share the main display");
            m_client->SelectSharedDisplay(platform::CGMainDisplayID());
    }
    m_desk.Run(*m_client, 0ms);
}

// ---- In the middle of a pass

void DeliveredHistory::Disturb(unsigned stamp) {
    constexpr SimulatedOperation OPERATIONS[] = {
        SimulatedOperation::GetLife,           SimulatedOperation::GetWindows,
        SimulatedOperation::GetDisplays,       SimulatedOperation::GetApplications,
        SimulatedOperation::GetCapability,     SimulatedOperation::GetPointerPosition,
        SimulatedOperation::TakeWindowPicture, SimulatedOperation::TakeNewest};
    const SimulatedOperation operation = OPERATIONS[Number(0, m_kind.IsOfSession() ? 7 : 6)];
    const auto nth = static_cast<unsigned>(Number(1, operation == SimulatedOperation::GetLife ? 60 : 4));
    const std::string when =
        " at call " + std::to_string(nth) + " of operation " + std::to_string(static_cast<int>(operation));
    if (m_kind.IsOfSession() && Chance(20)) {
        DisturbSession();
        return;
    }
    if (Chance(50)) {
        Tell("fail" + when);
        m_server->FailNth(operation, nth);
        return;
    }
    Window* const window = SomeWindow();
    const platform::CGRect frame = SomeFrame();
    if (window != nullptr && Chance(60)) {
        Tell("move " + std::to_string(window->id) + " to " + ShareUtilMac::CGRectToString(frame) + when);
        m_server->DoAt(operation, nth, [this, id = window->id, frame, stamp] {
            m_windowsChanged = CmSteadyNow();
            m_desk.Desk().SetFrame(id, frame);
            NoteMoment(stamp);
            m_desk.Desk().Raise(id);
            NoteMoment(stamp);
        });
        return;
    }
    Tell("open a secret at " + ShareUtilMac::CGRectToString(frame) + when);
    m_server->DoAt(operation, nth, [this, frame, stamp] {
        const auto owner = std::find_if(m_apps.begin(), m_apps.end(), [this](const App& app) {
            return app.isKeptOut || m_kind.IsOfWindows();
        });
        if (owner != m_apps.end())
            Open(static_cast<std::size_t>(owner - m_apps.begin()), frame);
        NoteMoment(stamp);
    });
}

void DeliveredHistory::Calm() {
    for (int operation = 0; operation <= static_cast<int>(SimulatedOperation::TakeWindowPicture); ++operation)
        m_server->Heal(static_cast<SimulatedOperation>(operation));
    m_server->Heal(SimulatedOperation::TakeNewest);
    // A queue hands over what it has at the next frame, and drops it when it is told before.
    std::vector<std::function<void()>> due = std::move(m_kind.IsQueued() ? m_veryLate : m_late);
    m_veryLate = std::move(m_late);
    m_late.clear();
    for (const std::function<void()>& tell : due)
        tell();
}
