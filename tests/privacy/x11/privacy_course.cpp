// SPDX-License-Identifier: Apache-2.0
#include "tests/privacy/x11/privacy_course.h"

#include "platform/core_graphics.h"
#include "platform/window_server.h"

#include <algorithm>
#include <stdexcept>
#include <thread>

/// What a run is made of; what happens in it stands in privacy_course_actions.cpp.

namespace {

using namespace std::chrono_literals;

constexpr auto PATIENCE = 90s;
constexpr int MENUS_SHOWN = -1;
constexpr int MENUS_SECRET = -2;

/// What the library calls a client's window, which isn't its number: a number that was used before gets
/// another name, so that nobody takes the one for the other. 0 as long as the library doesn't know it.
unsigned NameInLibrary(const RealClient& client) {
    if (client.Window() == 0)
        return 0;
    const auto windows = platform::CurrentWindowServer()->GetWindows();
    for (const platform::WindowInfo& info : windows->Windows()) {
        if (info.owner == client.Pid() && info.title == client.Title())
            return info.id;
    }
    return 0;
}

} // namespace

PrivacyCourse::PrivacyCourse(const PrivacyCourseOptions& options, RealDesk& desk, PrivacyJournal& journal)
    : m_options(options),
      m_desk(desk),
      m_journal(journal),
      m_random(options.seed) {
    m_journal.AddSecret(m_desk.Menus(true).Pid());
    m_journal.AddShown(m_desk.Menus(false).Pid());
}

int PrivacyCourse::Number(int least, int most) {
    return std::uniform_int_distribution<int>(least, most)(m_random);
}

SharedParty PrivacyCourse::PartyOf(const RealClient& client) const {
    const auto window = m_windows.find(client.Number());
    return {client.Number(), client.Pid(), window != m_windows.end() ? window->second : 0,
            client.HasPopups()};
}

SharedParty PrivacyCourse::MenusOf(bool isSecret) {
    return {isSecret ? MENUS_SECRET : MENUS_SHOWN, m_desk.Menus(isSecret).Pid(), 0, true};
}

std::vector<SharedParty> PrivacyCourse::Secrets() {
    std::vector<SharedParty> secrets{MenusOf(true)};
    for (const auto& client : m_desk.All()) {
        if (client->IsSecret())
            secrets.push_back(PartyOf(*client));
    }
    return secrets;
}

// ---- Turns

bool PrivacyCourse::OpenShown() {
    for (const RealKind kind : m_desk.Kinds()) {
        m_desk.Start(kind, false);
        const bool opened = ComesTrue(
            [this] {
                m_desk.Look();
                return NameInLibrary(*m_desk.All().back()) != 0;
            },
            PATIENCE);
        if (!opened)
            return false;
        Greet(*m_desk.All().back());
    }
    return true;
}

void PrivacyCourse::Run() {
    const auto time = std::chrono::milliseconds(m_options.duration) / m_options.modes.size();
    for (const SCREEN_CAPTURER_TYPE mode : m_options.modes)
        Turn(mode, time);
}

void PrivacyCourse::Turn(SCREEN_CAPTURER_TYPE mode, std::chrono::milliseconds time) {
    const auto start = Clock::now();
    const std::string name = "mode " + std::to_string(mode);
    m_mode = mode;
    m_desk.SetComposited(false);
    m_journal.SetPart(name);
    MakeShares(mode);
    auto nextLine = start + 10s;
    bool isComposited = false;
    const auto isOver = [&] {
        const auto passed = Clock::now() - start;
        return passed > time && (HasEnough() || passed > time + PATIENCE);
    };
    while (!isOver()) {
        if (!isComposited && RealDesk::HasPicom() && Clock::now() > start + time / 2) {
            isComposited = true;
            m_journal.SetPart(name + ", composited");
            m_desk.SetComposited(true);
        }
        Step();
        if (Clock::now() < nextLine)
            continue;
        nextLine += 10s;
        std::puts(m_journal.Progress().c_str());
        std::fflush(stdout);
    }
    m_hidden.clear();
    m_shares.clear();
}

/// A short run doesn't end before each of its shares has shown something.
bool PrivacyCourse::HasEnough() const {
    return std::all_of(PRIVACY_KINDS.begin(), PRIVACY_KINDS.end(), [this](SHARE_CAPTURE_ENGINE_TYPE kind) {
        return m_journal.Tally(kind, m_mode).alive >= 10;
    });
}

void PrivacyCourse::MakeShares(SCREEN_CAPTURER_TYPE mode) {
    for (const SHARE_CAPTURE_ENGINE_TYPE kind : PRIVACY_KINDS) {
        m_shares.push_back(std::make_unique<WatchedShare>(kind, mode, m_options.fault, m_journal));
        WatchedShare& share = *m_shares.back();
        if (kind == SHARE_CAPTURE_ENGINE_TYPE_DESKTOP)
            share.Engine().SelectSharedDisplay(platform::CGMainDisplayID());
        share.Engine().SetCaptureFps(20);
        share.Show(MenusOf(false));
        for (const auto& client : m_desk.All()) {
            if (!client->IsSecret())
                share.Show(PartyOf(*client));
        }
        for (const SharedParty& secret : Secrets())
            share.Meet(secret);
    }
}

void PrivacyCourse::Step() {
    constexpr int STEPS_OF_A_BURST = 7;
    Tend();
    if (++m_steps % STEPS_OF_A_BURST == 0) {
        // What is beside secrets on the screen of a compositor is looked at once it has been at rest for a
        // while.
        Rest(std::chrono::milliseconds(Number(800, 3200)));
        return;
    }
    for (int i = Number(1, 3); i > 0; --i)
        Act();
    Rest(std::chrono::milliseconds(Number(20, 220)));
}

/// The shares go on, and so does what the programs do by themselves.
void PrivacyCourse::Rest(std::chrono::milliseconds time) {
    const auto end = Clock::now() + time;
    do {
        std::this_thread::sleep_for(std::min<Clock::duration>(time, 50ms));
        m_desk.Look();
        MeetAll();
    } while (Clock::now() < end);
}

/// What nobody does, but has to be done.
void PrivacyCourse::Tend() {
    m_desk.Look();
    MeetAll();
    for (std::size_t i = m_desk.All().size(); i-- > 0;) {
        RealClient& client = *m_desk.All()[i];
        if (client.HasGone()) {
            TakeLeave(client);
            m_desk.End(client);
        }
    }
    StartMissing();
    AskForThumbnails();
    for (const auto& share : m_shares) {
        share->Start(); // there may have been nothing to share
        share->Tend();
    }
}

// ---- Programs

void PrivacyCourse::MeetAll() {
    for (const auto& client : m_desk.All()) {
        if (m_windows.count(client->Number()) == 0 && NameInLibrary(*client) != 0)
            Greet(*client);
    }
}

void PrivacyCourse::Greet(RealClient& client) {
    const unsigned window = NameInLibrary(client);
    m_windows[client.Number()] = window;
    if (!client.IsSecret())
        m_journal.AddShown(client.Pid());
    Note(client.Name() + " opens " + std::to_string(client.Window()) + ", which is called " +
         std::to_string(window));
    for (const auto& share : m_shares) {
        if (client.IsSecret())
            share->Meet(PartyOf(client));
        else
            share->Show(PartyOf(client));
    }
    m_desk.Wishes().Put(client.Window(), AnyPlace());
}

/// Before or after its end.
void PrivacyCourse::TakeLeave(RealClient& client) {
    const SharedParty party = PartyOf(client);
    std::erase_if(m_hidden, [&](const auto& each) { return each.second.number == party.number; });
    for (const auto& share : m_shares) {
        if (client.IsSecret())
            share->KeepOut(party);
        else if (Chance(50))
            share->ShowNoMore(party);
    }
}

void PrivacyCourse::StartMissing() {
    const bool isWaiting = std::any_of(m_desk.All().begin(), m_desk.All().end(),
                                       [](const auto& each) { return each->Window() == 0; });
    if (isWaiting && Clock::now() > m_waitingSince + PATIENCE)
        throw std::runtime_error(m_desk.All().back()->Name() + " opens no window");
    // A number of a window that has gone may be another's soon, and a thumbnail that was asked for shows it
    // then.
    if (isWaiting || m_windowThumbnails.IsUnderWay() || m_applicationThumbnails.IsUnderWay())
        return;
    for (const RealKind kind : m_desk.Kinds()) {
        for (const bool isSecret : {true, false}) {
            const bool isThere = std::any_of(m_desk.All().begin(), m_desk.All().end(), [&](const auto& each) {
                return each->Kind() == kind && each->IsSecret() == isSecret;
            });
            if (isThere || !Chance(50))
                continue;
            RealClient& client = m_desk.Start(kind, isSecret);
            m_waitingSince = Clock::now();
            Note("start " + client.Name());
            if (!isSecret)
                return;
            m_journal.AddSecret(client.Pid());
            for (const auto& share : m_shares)
                share->Meet(PartyOf(client));
            return;
        }
    }
}

void PrivacyCourse::AskForThumbnails() {
    if (m_windowThumbnails.IsUnderWay() || m_applicationThumbnails.IsUnderWay())
        return;
    WatchedThumbnails::Wanted windows;
    WatchedThumbnails::Wanted applications;
    for (const auto& client : m_desk.All()) {
        const SharedParty party = PartyOf(*client);
        if (client->Window() == 0 || party.window == 0)
            continue;
        if (!client->IsSecret())
            applications[static_cast<unsigned>(party.pid)] = {};
        windows[party.window] =
            client->IsSecret() ? std::string("secret ") + NameOf(client->Kind()) : std::string();
    }
    m_windowThumbnails.AskForWindows(windows, m_mode);
    m_applicationThumbnails.AskForApplications(applications, m_mode);
}
