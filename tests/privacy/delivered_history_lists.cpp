// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_util_mac.h"
#include "tests/privacy/delivered_history.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>

/// The part of a history that is about what may be seen: windows by their colours, and the client's lists.

using namespace std::chrono_literals;

bool DeliveredHistory::MustNotBeSeen(const Window& window) const {
    return IsKeptOut(window) || window.isSecretOfServer;
}

bool DeliveredHistory::IsKeptOut(const Window& window) const {
    if (window.verdict != Verdict::None)
        return window.verdict == Verdict::KeptOut;
    return m_kind.IsOfWindows() || m_apps[window.app].isKeptOut;
}

void DeliveredHistory::Paint(Window& window) {
    window.worn.insert(PaintOf(window));
    m_desk.Desk().Recolour(window.id, PaintOf(window));
}

std::uint32_t DeliveredHistory::PaintOf(const Window& window) const {
    constexpr std::uint32_t RED = 0xFF0000;
    return MustNotBeSeen(window) ? RED | window.rgb : window.rgb;
}

void DeliveredHistory::Open(std::size_t app, const platform::CGRect& frame, bool isPopup) {
    Window window;
    window.app = app;
    window.rgb = NextColour();
    window.isPopup = isPopup;
    const pid_t pid = m_apps[app].pid;
    const std::uint32_t rgb = PaintOf(window);
    window.worn = {rgb};
    window.id =
        (isPopup ? m_desk.AddPopup(pid, frame, rgb) : m_desk.Desk().AddWindow(pid, frame, rgb)).value_or(0);
    m_windows.push_back(window);
    Tell((isPopup ? "pop up " : "open ") + std::to_string(window.id) + " of application " +
         std::to_string(app) + " at " + ShareUtilMac::CGRectToString(frame));
}

/// A menu, where it can be seen.
void DeliveredHistory::PopUp(std::size_t app) {
    const platform::CGRect frame{{static_cast<float>(Number(0, 150)), static_cast<float>(Number(0, 80))},
                                 {static_cast<float>(Number(10, 50)), static_cast<float>(Number(10, 40))}};
    Open(app, frame, true);
}

void DeliveredHistory::Close(std::size_t window) {
    Tell("close " + std::to_string(m_windows[window].id));
    m_desk.Desk().Close(m_windows[window].id);
    m_windows.erase(m_windows.begin() + static_cast<std::ptrdiff_t>(window));
}

void DeliveredHistory::ClosePopups() {
    for (std::size_t i = m_windows.size(); i-- > 0;) {
        if (m_windows[i].isPopup && Chance(30))
            Close(i);
    }
}

/// A share of windows has each of them in it or not; elsewhere a verdict can also be taken back.
DeliveredHistory::Verdict DeliveredHistory::OtherVerdict(const Window& window) {
    constexpr Verdict OTHERS[][2] = {{Verdict::Shared, Verdict::KeptOut},
                                     {Verdict::None, Verdict::KeptOut},
                                     {Verdict::None, Verdict::Shared}};
    if (m_kind.IsOfWindows() && IsKeptOut(window))
        return Verdict::Shared;
    return OTHERS[static_cast<int>(window.verdict)][Number(0, 1)];
}

void DeliveredHistory::Decide(Window& window, Verdict verdict) {
    constexpr const char* WORDS[] = {"leave window to its application: ", "share window ",
                                     "keep out window "};
    Tell(WORDS[static_cast<int>(verdict)] + std::to_string(window.id));
    const Verdict former = window.verdict;
    const bool wasKeptOut = IsKeptOut(window);
    window.verdict = verdict;
    const bool isHidden = IsKeptOut(window) && !wasKeptOut;
    if (!isHidden)
        Paint(window);
    TellEngine(isHidden, [this, id = window.id, former, verdict] { TellVerdict(id, former, verdict); });
    Paint(window);
    if (m_fault == DeliveredFault::OneWindowTooMany && m_kind.IsOfWindows() && isHidden)
        LetOneThrough(window.app);
}

void DeliveredHistory::TellVerdict(platform::CGWindowID window, Verdict former, Verdict verdict) {
    if (verdict == Verdict::Shared)
        ExpectDone(m_client->AddSharedWindow(window));
    else if (verdict == Verdict::KeptOut)
        ExpectDone(m_client->AddUnSharedWindow(window));
    else if (former == Verdict::Shared)
        ExpectDone(m_client->RemoveSharedWindow(window));
    else
        ExpectDone(m_client->RemoveUnSharedWindow(window));
}

void DeliveredHistory::KeepOut(App& app, bool isKeptOut) {
    const auto index = static_cast<std::size_t>(&app - m_apps.data());
    // Of windows that are shared by themselves, and where nothing at all would be left to share.
    if (m_kind.IsOfWindows() || (m_kind.IsOfApplications() && index == 0 && isKeptOut))
        return;
    Tell((isKeptOut ? "keep out application " : "no more keep out application ") + std::to_string(index));
    const auto paint = [&] {
        for (Window& window : m_windows) {
            if (window.app == index)
                Paint(window);
        }
    };
    app.isKeptOut = isKeptOut;
    if (!isKeptOut)
        paint();
    // In a share of applications both ways of saying it come to the same.
    const bool isTakenBack = m_kind.IsOfApplications() && Chance(50);
    TellEngine(isKeptOut, [this, pid = static_cast<unsigned>(app.pid), isKeptOut, isTakenBack] {
        if (isKeptOut)
            ExpectDone(isTakenBack ? m_client->RemoveSharedProcess(pid) : m_client->AddUnSharedProcess(pid));
        else if (m_kind.IsOfApplications())
            ExpectDone(m_client->AddSharedProcess(pid));
        else
            ExpectDone(m_client->RemoveUnSharedProcess(pid));
    });
    paint();
    if (m_fault == DeliveredFault::OneWindowTooMany && isKeptOut)
        LetOneThrough(index);
}

void DeliveredHistory::LetOneThrough(std::size_t app) {
    const auto window = std::find_if(m_windows.begin(), m_windows.end(),
                                     [app](const Window& each) { return each.app == app; });
    if (window == m_windows.end())
        return;
    EXPECT_EQ(m_client->AddSharedWindow(window->id), 0);
    m_desk.Run(*m_client, 0ms);
}

void DeliveredHistory::TellEngine(bool isKeptOut, const std::function<void()>& tell) {
    if (isKeptOut && m_fault == DeliveredFault::ExclusionForgotten)
        return;
    if (isKeptOut && m_fault == DeliveredFault::ExclusionTooLate) {
        m_late.push_back(tell);
        return;
    }
    tell();
    if (m_fault == DeliveredFault::NothingShown)
        ShowNothing();
    m_desk.Run(*m_client, 0ms); // it holds from here on
    if (isKeptOut) {
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_stepOfSecret = m_step + 1; // that of the frames to come
    }
}

/// But of a share that is still there.
void DeliveredHistory::ShowNothing() {
    if (m_kind.IsOfDesktop()) {
        for (const App& app : m_apps)
            m_client->AddUnSharedProcess(static_cast<unsigned>(app.pid));
        return;
    }
    // A share of nothing does not start.
    for (const Window& window : m_windows) {
        if (m_step > 0)
            m_client->AddUnSharedWindow(window.id);
    }
}
