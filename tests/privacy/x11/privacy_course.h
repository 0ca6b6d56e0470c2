// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/privacy/x11/privacy_journal.h"
#include "tests/privacy/x11/real_desk.h"
#include "tests/privacy/x11/watched_share.h"
#include "tests/privacy/x11/watched_thumbnails.h"

#include <chrono>
#include <functional>
#include <map>
#include <memory>
#include <random>
#include <string>
#include <utility>
#include <vector>

struct PrivacyCourseOptions {
    std::chrono::seconds duration{600};
    unsigned seed = 20261122;
    std::vector<SCREEN_CAPTURER_TYPE> modes{PRIVACY_MODES.begin(), PRIVACY_MODES.end()};
    PrivacyFault fault = PrivacyFault::None;
};

/// Whatever people and clients of the library do, by a seed: a quarter of the time in each mode, a desktop
/// share, one of applications and one of windows beside each other, half of it with a compositor.
/// Threads: one.
class PrivacyCourse {
public:
    PrivacyCourse(const PrivacyCourseOptions& options, RealDesk& desk, PrivacyJournal& journal);

    /// Opens what may be seen, and nothing else. False when that doesn't work.
    bool OpenShown();
    void Run();

private:
    using Clock = std::chrono::steady_clock;
    struct Action {
        int weight;
        void (PrivacyCourse::*act)();
    };

    static const Action ACTIONS[];

    // ---- Turns
    void Turn(SCREEN_CAPTURER_TYPE mode, std::chrono::milliseconds time);
    void MakeShares(SCREEN_CAPTURER_TYPE mode);
    void Step();
    void Rest(std::chrono::milliseconds time);
    void Act();
    void Tend();
    bool HasEnough() const;

    // ---- Programs
    void MeetAll();
    void Greet(RealClient& client);
    void TakeLeave(RealClient& client);
    void StartMissing();
    void AskForThumbnails();
    void CloseClient();
    void KillClient();

    // ---- Windows
    void Move();
    void Resize();
    void Raise();
    void Lower();
    void Minimise();
    void Restore();
    void Maximise();
    void FillScreen();
    void RollUp();
    void ShowWorkspace();
    void OpenMenu();
    void CloseMenu();
    void Hammer();

    // ---- Shares
    void KeepOutOtherwise();
    void LetIn();
    void KeepOut();
    void HideShown();
    void ShowShown();
    void Pause();
    void ChangeRate();
    void ChangeSize();
    void ChangeMode();
    void ForceFrame();
    void SelectDisplay();

    // ---- Desktop
    void PlugSide();
    void ResizeMain();
    void MovePointer();

    SharedParty PartyOf(const RealClient& client) const;
    SharedParty MenusOf(bool isSecret);
    std::vector<SharedParty> Secrets();
    RealClient* AnyClient();
    std::uint32_t AnyWindow(const std::string& what);
    WatchedShare& AnyShare();
    WindowWishes::Place AnyPlace();
    int Number(int least, int most);
    bool Chance(int percent) { return Number(1, 100) <= percent; }
    void Note(const std::string& action) { m_journal.Note(action); }

    const PrivacyCourseOptions m_options;
    RealDesk& m_desk;
    PrivacyJournal& m_journal;
    std::minstd_rand m_random;
    SCREEN_CAPTURER_TYPE m_mode = SCREEN_CAPTURER_TYPE_DEFAULT;
    std::vector<std::unique_ptr<WatchedShare>> m_shares;
    WatchedThumbnails m_windowThumbnails{m_journal};
    WatchedThumbnails m_applicationThumbnails{m_journal};
    std::map<int, unsigned>
        m_windows; // as the library calls those of clients, by number, also when they have gone
    std::vector<std::pair<WatchedShare*, SharedParty>> m_hidden; // who may be seen and isn't
    std::vector<std::pair<bool, std::string>> m_menus;           // open ones: secret or not, and name
    Clock::time_point m_waitingSince = Clock::now();             // for a window
    bool m_isSideOn = true;
    bool m_isMainSmall = false;
    int m_steps = 0;
    int m_counter = 0;
};
