// SPDX-License-Identifier: Apache-2.0
#include "tests/privacy/x11/privacy_course.h"

#include "platform/core_graphics.h"

#include <algorithm>
#include <array>
#include <cstdio>

/// What happens in a run.

namespace {

std::string ToString(const WindowWishes::Place& place) {
    return std::to_string(place.x) + " " + std::to_string(place.y) + " " + std::to_string(place.width) + " " +
           std::to_string(place.height);
}

} // namespace

/// How likely, beside the others, and what.
const PrivacyCourse::Action PrivacyCourse::ACTIONS[] = {
    Action{14, &PrivacyCourse::Move},       Action{8, &PrivacyCourse::Resize},
    Action{10, &PrivacyCourse::Raise},      Action{4, &PrivacyCourse::Lower},
    Action{5, &PrivacyCourse::Minimise},    Action{8, &PrivacyCourse::Restore},
    Action{2, &PrivacyCourse::Maximise},    Action{2, &PrivacyCourse::FillScreen},
    Action{2, &PrivacyCourse::RollUp},      Action{2, &PrivacyCourse::ShowWorkspace},
    Action{6, &PrivacyCourse::OpenMenu},    Action{6, &PrivacyCourse::CloseMenu},
    Action{1, &PrivacyCourse::Hammer},      Action{3, &PrivacyCourse::CloseClient},
    Action{2, &PrivacyCourse::KillClient},  Action{4, &PrivacyCourse::KeepOutOtherwise},
    Action{2, &PrivacyCourse::LetIn},       Action{9, &PrivacyCourse::KeepOut},
    Action{1, &PrivacyCourse::HideShown},   Action{6, &PrivacyCourse::ShowShown},
    Action{1, &PrivacyCourse::Pause},       Action{2, &PrivacyCourse::ChangeRate},
    Action{3, &PrivacyCourse::ChangeSize},  Action{1, &PrivacyCourse::ChangeMode},
    Action{2, &PrivacyCourse::ForceFrame},  Action{2, &PrivacyCourse::SelectDisplay},
    Action{1, &PrivacyCourse::PlugSide},    Action{1, &PrivacyCourse::ResizeMain},
    Action{4, &PrivacyCourse::MovePointer},
};

void PrivacyCourse::Act() {
    int all = 0;
    for (const Action& action : ACTIONS)
        all += action.weight;
    int dice = Number(1, all);
    for (const Action& action : ACTIONS) {
        dice -= action.weight;
        if (dice <= 0) {
            (this->*action.act)();
            return;
        }
    }
}

// ---- Who and where

RealClient* PrivacyCourse::AnyClient() {
    const RealDesk::Clients& all = m_desk.All();
    if (all.empty())
        return nullptr;
    RealClient* const client =
        all[static_cast<std::size_t>(Number(0, static_cast<int>(all.size()) - 1))].get();
    return client->Window() != 0 ? client : nullptr;
}

/// 0 when there is none.
std::uint32_t PrivacyCourse::AnyWindow(const std::string& what) {
    const RealClient* const client = AnyClient();
    if (client == nullptr)
        return 0;
    Note(what + " " + client->Name());
    return client->Window();
}

WatchedShare& PrivacyCourse::AnyShare() {
    return *m_shares[static_cast<std::size_t>(Number(0, static_cast<int>(m_shares.size()) - 1))];
}

/// Mostly on the main monitor, so that they lie over each other.
WindowWishes::Place PrivacyCourse::AnyPlace() {
    const bool isOnSide = Chance(25);
    const int x = isOnSide ? Number(RealDesk::WIDTH - 150, RealDesk::WIDTH + RealDesk::SIDE_WIDTH - 60)
                           : Number(-80, RealDesk::WIDTH - 200);
    return {x, Number(-20, RealDesk::HEIGHT - 150), Number(120, 560), Number(90, 420)};
}

// ---- Windows

void PrivacyCourse::Move() {
    const std::uint32_t window = AnyWindow("move");
    WindowWishes::Place place = AnyPlace();
    place.width = 0;
    if (window != 0)
        m_desk.Wishes().Put(window, place);
}

void PrivacyCourse::Resize() {
    const WindowWishes::Place place = AnyPlace();
    const std::uint32_t window = AnyWindow("to " + ToString(place));
    if (window != 0)
        m_desk.Wishes().Put(window, place);
}

void PrivacyCourse::Raise() {
    if (const std::uint32_t window = AnyWindow("raise"); window != 0)
        m_desk.Wishes().Raise(window);
}

void PrivacyCourse::Lower() {
    if (const std::uint32_t window = AnyWindow("lower"); window != 0)
        m_desk.Wishes().Lower(window);
}

void PrivacyCourse::Minimise() {
    if (const std::uint32_t window = AnyWindow("minimise"); window != 0)
        m_desk.Wishes().Minimise(window);
}

void PrivacyCourse::Restore() {
    if (const std::uint32_t window = AnyWindow("restore"); window != 0)
        m_desk.Wishes().Restore(window);
}

void PrivacyCourse::Maximise() {
    if (const std::uint32_t window = AnyWindow("(un)maximise"); window != 0)
        m_desk.Wishes().ToggleMaximised(window);
}

void PrivacyCourse::FillScreen() {
    if (const std::uint32_t window = AnyWindow("(un)fill the screen with"); window != 0)
        m_desk.Wishes().ToggleFullScreen(window);
}

void PrivacyCourse::RollUp() {
    if (const std::uint32_t window = AnyWindow("roll up or down"); window != 0)
        m_desk.Wishes().ToggleRolledUp(window);
}

void PrivacyCourse::ShowWorkspace() {
    const bool isOther = Chance(30);
    Note(isOther ? "show the second workspace" : "show the first workspace");
    m_desk.Wishes().ShowWorkspace(isOther ? 1 : 0);
}

/// Some are late to paint.
void PrivacyCourse::OpenMenu() {
    constexpr std::size_t MOST = 5;
    if (m_menus.size() >= MOST)
        return;
    const bool isSecret = Chance(60);
    const WindowWishes::Place place = AnyPlace();
    const std::string name = "menu" + std::to_string(++m_counter);
    Note(std::string("open a ") + (isSecret ? "secret menu" : "menu") + " at " + ToString(place));
    const std::string form = name + " " + ToString({place.x, place.y, place.width / 2, place.height / 2}) +
                             (isSecret ? " ff00ff" : " 00ff00") + " override none slow=25";
    if (m_desk.Menus(isSecret).Tell("create " + form))
        m_menus.emplace_back(isSecret, name);
}

void PrivacyCourse::CloseMenu() {
    if (m_menus.empty())
        return;
    const auto [isSecret, name] = m_menus.front();
    m_menus.erase(m_menus.begin());
    Note(std::string("close a ") + (isSecret ? "secret menu" : "menu"));
    m_desk.Menus(isSecret).Tell("destroy " + name);
}

/// A shower of secret menus.
void PrivacyCourse::Hammer() {
    const WindowWishes::Place place = AnyPlace();
    Note("hammer");
    m_desk.Menus(true).Tell("hammer " + ToString(place) + " ff00ff " + std::to_string(Number(1, 1 << 20)) +
                            (Chance(50) ? " every=60" : ""));
    Rest(std::chrono::milliseconds(Number(200, 900)));
    m_desk.Menus(true).Tell("calm");
}

void PrivacyCourse::CloseClient() {
    RealClient* const client = AnyClient();
    if (client == nullptr || (client->Kind() == RealKind::Browser && !Chance(35)))
        return;
    Note("close " + client->Name());
    TakeLeave(*client);
    m_desk.Wishes().Close(client->Window());
}

void PrivacyCourse::KillClient() {
    RealClient* const client = AnyClient();
    if (client == nullptr || (client->Kind() == RealKind::Browser && !Chance(25)))
        return;
    Note("kill " + client->Name());
    TakeLeave(*client);
    m_desk.End(*client);
}

// ---- Shares

void PrivacyCourse::KeepOutOtherwise() {
    const std::vector<SharedParty> secrets = Secrets();
    const SharedParty& secret =
        secrets[static_cast<std::size_t>(Number(0, static_cast<int>(secrets.size()) - 1))];
    WatchedShare& share = AnyShare();
    Note("keep " + std::to_string(secret.number) + " out by its window, " + NameOf(share.Kind()));
    share.KeepOutByWindow(secret);
}

void PrivacyCourse::LetIn() {
    const std::vector<SharedParty> secrets = Secrets();
    const SharedParty& secret =
        secrets[static_cast<std::size_t>(Number(0, static_cast<int>(secrets.size()) - 1))];
    WatchedShare& share = AnyShare();
    Note("let " + std::to_string(secret.number) + " in, " + NameOf(share.Kind()));
    share.LetIn(secret);
}

void PrivacyCourse::KeepOut() {
    for (const auto& share : m_shares) {
        for (const SharedParty& secret : Secrets()) {
            if (!share->IsLetIn(secret))
                continue;
            Note("keep " + std::to_string(secret.number) + " out again, " + NameOf(share->Kind()));
            if (Chance(30))
                share->KeepOutByWindow(secret);
            share->KeepOut(secret);
        }
    }
}

void PrivacyCourse::HideShown() {
    const RealClient* const client = AnyClient();
    if (client == nullptr || client->IsSecret())
        return;
    WatchedShare& share = AnyShare();
    Note("hide " + client->Name() + ", " + NameOf(share.Kind()));
    share.ShowNoMore(PartyOf(*client));
    m_hidden.emplace_back(&share, PartyOf(*client));
}

void PrivacyCourse::ShowShown() {
    for (const auto& [share, party] : m_hidden) {
        Note("show " + std::to_string(party.number) + " again, " + NameOf(share->Kind()));
        share->Show(party);
    }
    m_hidden.clear();
}

void PrivacyCourse::Pause() {
    WatchedShare& share = AnyShare();
    Note(std::string("pause and resume, ") + NameOf(share.Kind()));
    share.Engine().Pause();
    for (int i = Number(1, 4); i > 0; --i)
        Move();
    Rest(std::chrono::milliseconds(Number(50, 500)));
    share.Engine().Resume();
}

void PrivacyCourse::ChangeRate() {
    WatchedShare& share = AnyShare();
    const auto rate = static_cast<unsigned>(Number(1, 6) * 5);
    Note("rate " + std::to_string(rate) + ", " + NameOf(share.Kind()));
    share.Engine().SetCaptureFps(rate);
}

void PrivacyCourse::ChangeSize() {
    WatchedShare& share = AnyShare();
    const bool isSmall = Chance(40);
    Note(std::string(isSmall ? "small" : "large") + " frames, " + NameOf(share.Kind()));
    if (isSmall)
        share.Engine().SetCaptureMaxFrameSize(static_cast<unsigned>(Number(160, 640)),
                                              static_cast<unsigned>(Number(120, 480)));
    else
        share.Engine().SetCaptureMaxFrameSize(1920, 1080);
}

void PrivacyCourse::ChangeMode() {
    WatchedShare& share = AnyShare();
    const SCREEN_CAPTURER_TYPE mode =
        PRIVACY_MODES[static_cast<std::size_t>(Number(0, static_cast<int>(PRIVACY_MODES.size()) - 1))];
    Note("mode " + std::to_string(mode) + " and back, " + NameOf(share.Kind()));
    share.SetOtherMode(mode);
    Rest(std::chrono::milliseconds(Number(50, 1500)));
    share.SetMode();
}

void PrivacyCourse::ForceFrame() {
    bool isOn = true;
    AnyShare().Engine().Config(SHARE_CAPTURE_ENGINE_CONFIG_FORCE_FRAME, &isOn, sizeof(isOn));
}

void PrivacyCourse::SelectDisplay() {
    std::array<platform::CGDirectDisplayID, 4> displays{};
    std::uint32_t count = 0;
    platform::CGGetOnlineDisplayList(static_cast<std::uint32_t>(displays.size()), displays.data(), &count);
    if (count == 0)
        return;
    const int index = Number(0, std::min(static_cast<int>(displays.size()), static_cast<int>(count)) - 1);
    Note("share display " + std::to_string(index));
    m_shares.front()->Engine().SelectSharedDisplay(displays[static_cast<std::size_t>(index)]);
}

// ---- Desktop

void PrivacyCourse::PlugSide() {
    m_isSideOn = !m_isSideOn;
    Note(m_isSideOn ? "plug the side monitor in" : "unplug the side monitor");
    m_desk.PlugSide(m_isSideOn);
}

void PrivacyCourse::ResizeMain() {
    m_isMainSmall = !m_isMainSmall;
    Note("resize the main monitor");
    m_desk.ResizeMain(m_isMainSmall);
}

void PrivacyCourse::MovePointer() {
    m_desk.Wishes().MovePointer(Number(0, RealDesk::WIDTH + RealDesk::SIDE_WIDTH),
                                Number(0, RealDesk::HEIGHT));
}
