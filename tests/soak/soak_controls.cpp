// SPDX-License-Identifier: Apache-2.0
#include "tests/soak/soak_controls.h"

#include <utility>

namespace {

using namespace std::chrono_literals;

constexpr std::chrono::milliseconds PACE = 40ms; // from action to action
constexpr int ACTIONS_PER_REQUEST = 5;           // of thumbnails
constexpr std::chrono::milliseconds A_WHILE = 100ms;
constexpr unsigned WIDEST = 1920; // of a frame, if the monitor were as wide
constexpr unsigned HIGHEST = 1080;

} // namespace

SoakControls::SoakControls(const SoakOptions& options, const SoakDesk& desk, const Shares& shares,
                           const std::vector<unsigned>& displays, const std::atomic<bool>& counts)
    : m_framesPerSecond(options.framesPerSecond),
      m_desk(desk),
      m_shares(shares),
      m_displays(displays),
      m_counts(counts),
      m_random(options.seed + 1) {
    AddQuestions();
    AddSettings();
    AddContent();
    AddLives();
    AddPickers();
}

std::string SoakControls::Failure() const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return m_failure;
}

// ---- What can be done

void SoakControls::AddQuestions() {
    AddCall("GetShareCaptureStatistic", 6, [](IShareCaptureEngine& engine) {
        SHARE_CAPTURE_STATISTIC statistic{};
        return engine.GetShareCaptureStatistic(statistic);
    });
    AddCall("GetCaptureSize", 4, [](IShareCaptureEngine& engine) {
        TVLSize size{};
        engine.GetCaptureSize(size);
        return 0;
    });
    AddCall("GetCaptureStatus", 4,
            [](IShareCaptureEngine& engine) { return static_cast<int>(engine.GetCaptureStatus()); });
    AddCall("IsWindowShared", 4,
            [this](IShareCaptureEngine& engine) { return engine.IsWindowShared(AnyWindow()) ? 1 : 0; });
}

void SoakControls::AddSettings() {
    AddCall("SetCaptureFps", 4,
            [this](IShareCaptureEngine& engine) { return engine.SetCaptureFps(m_framesPerSecond); });
    AddAction({"SetCaptureMaxFrameSize"}, 2, [this] { ShrinkAndGrow(*AnyShare().Engine()); });
    AddCall("SetAppShareBackgroundColor", 1, [this](IShareCaptureEngine& engine) {
        return engine.SetAppShareBackgroundColor(static_cast<int>(Random(0x1000000)));
    });
    AddCall("Config", 2, [](IShareCaptureEngine& engine) {
        bool yes = true;
        return engine.Config(SHARE_CAPTURE_ENGINE_CONFIG_FORCE_FRAME, &yes, sizeof(yes));
    });
}

void SoakControls::AddContent() {
    const auto stranger = [this] { return m_desk.Scene().stranger; };
    AddPair("AddUnSharedProcess", "RemoveUnSharedProcess", SHARE_CAPTURE_ENGINE_TYPE_DESKTOP, stranger,
            &IShareCaptureEngine::AddUnSharedProcess, &IShareCaptureEngine::RemoveUnSharedProcess);
    AddPair(
        "AddSharedProcess", "RemoveSharedProcess", SHARE_CAPTURE_ENGINE_TYPE_APP,
        [this] { return m_desk.Scene().guest; }, &IShareCaptureEngine::AddSharedProcess,
        &IShareCaptureEngine::RemoveSharedProcess);
    AddPair(
        "AddSharedWindow", "RemoveSharedWindow", SHARE_CAPTURE_ENGINE_TYPE_WINDOW,
        [this] { return m_desk.Scene().guestWindow; }, &IShareCaptureEngine::AddSharedWindow,
        &IShareCaptureEngine::RemoveSharedWindow);
    AddPair(
        "AddUnSharedWindow", "RemoveUnSharedWindow", SHARE_CAPTURE_ENGINE_TYPE_DESKTOP,
        [this] { return AnyWindow(); }, &IShareCaptureEngine::AddUnSharedWindow,
        &IShareCaptureEngine::RemoveUnSharedWindow);
    AddAction({"SelectSharedDisplay"}, 2, [this] {
        IShareCaptureEngine& engine = *AnyShare(SHARE_CAPTURE_ENGINE_TYPE_DESKTOP).Engine();
        const unsigned display = m_displays[Random(m_displays.size())];
        Measure("SelectSharedDisplay", [&] { return engine.SelectSharedDisplay(display); });
    });
}

void SoakControls::AddLives() {
    AddAction({"Pause", "Resume"}, 2, [this] { PauseAndResume(AnyShare()); });
    AddAction({"Stop", "Start"}, 1, [this] { StopAndStart(AnyShare()); });
    AddAction({"CreateShareCaptureEngine", "DestroyShareCaptureEngine", "SetCaptureMode and what to share"},
              1, [this] { MakeAnew(AnyShare()); });
}

void SoakControls::AddPickers() {
    AddAction({"TvlEnumWindows, ShareGetWindowInfo"}, 2,
              [this] { Measure("TvlEnumWindows, ShareGetWindowInfo", WalkOverWindows); });
    AddAction({"CreateShareSourceEnumerator, Refresh", "GetSource of each", "DestroyShareSourceEnumerator"},
              2, [this] { ListAnew(); });
    AddAction({"EnumAppThumbnail", "EnumWindowThumbnail", "CancelThumbnail"}, 1, [this] {
        Measure("CancelThumbnail", [this] {
            CancelThumbnail(&m_ofWindows);
            return 0;
        });
    });
}

void SoakControls::AddCall(const std::string& name, int weight, const Call& call) {
    AddAction({name}, weight, [this, name, call] {
        IShareCaptureEngine& engine = *AnyShare().Engine();
        Measure(name, [&] { return call(engine); });
    });
}

void SoakControls::AddPair(const std::string& first, const std::string& second,
                           SHARE_CAPTURE_ENGINE_TYPE type, const std::function<unsigned()>& argument,
                           int (IShareCaptureEngine::*in)(unsigned),
                           int (IShareCaptureEngine::*out)(unsigned)) {
    AddAction({first, second}, 2, [this, first, second, type, argument, in, out] {
        IShareCaptureEngine& engine = *AnyShare(type).Engine();
        const unsigned what = argument();
        Measure(first, [&] { return (engine.*in)(what); });
        Wait(A_WHILE);
        Measure(second, [&] { return (engine.*out)(what); });
    });
}

void SoakControls::AddAction(const std::vector<std::string>& names, int weight, std::function<void()> act) {
    for (const std::string& name : names)
        m_calls[name];
    m_actions.push_back({weight, std::move(act)});
    m_weights += static_cast<std::size_t>(weight);
}

int SoakControls::Measure(const std::string& name, const std::function<int()>& call) {
    SoakCall& kept = m_calls.at(name);
    const auto start = std::chrono::steady_clock::now();
    const int result = call();
    const auto took = std::chrono::steady_clock::now() - start;
    if (!m_counts)
        return result;
    kept.latency.Add(took);
    if (result < 0)
        ++kept.refused;
    return result;
}

// ---- What takes several calls

/// In the end all is as it was: what is measured is what grows, and not what is set.
void SoakControls::ShrinkAndGrow(IShareCaptureEngine& engine) {
    const unsigned part = 2 + static_cast<unsigned>(Random(5));
    Measure("SetCaptureMaxFrameSize",
            [&] { return engine.SetCaptureMaxFrameSize(WIDEST / part, HIGHEST / part); });
    Wait(A_WHILE);
    Measure("SetCaptureMaxFrameSize", [&] { return engine.SetCaptureMaxFrameSize(WIDEST, HIGHEST); });
}

void SoakControls::PauseAndResume(SoakShare& share) {
    Measure("Pause", [&] { return share.Engine()->Pause(); });
    Wait(A_WHILE);
    share.Interrupt();
    Insist("Resume", Measure("Resume", [&] { return share.Engine()->Resume(); }));
}

void SoakControls::StopAndStart(SoakShare& share) {
    Insist("Stop", Measure("Stop", [&] { return share.Engine()->Stop(); }));
    Wait(A_WHILE);
    Insist("Start", Measure("Start", [&] { return share.Start(); }));
}

void SoakControls::MakeAnew(SoakShare& share) {
    const unsigned display = m_displays[share.Plan().monitor % m_displays.size()];
    Insist("Destroy", Measure("DestroyShareCaptureEngine", [&] { return share.Destroy(); }));
    Insist("Create", Measure("CreateShareCaptureEngine", [&] { return share.Create(); }));
    Insist("Prepare", Measure("SetCaptureMode and what to share", [&] { return share.Prepare(display); }));
    Insist("Start", Measure("Start", [&] { return share.Start(); }));
}

void SoakControls::ListAnew() {
    const SHARE_SOURCE_ENUMERATOR_TYPE type =
        Random(2) == 0 ? SHARE_SOURCE_ENUMERATOR_TYPE_APP : SHARE_SOURCE_ENUMERATOR_TYPE_MONITOR;
    std::unique_ptr<SoakList> list;
    Measure("CreateShareSourceEnumerator, Refresh", [&] {
        list = std::make_unique<SoakList>(type);
        return 0;
    });
    Measure("GetSource of each", [&] { return list->Read(); });
    Measure("DestroyShareSourceEnumerator", [&] {
        list.reset();
        return 0;
    });
}

void SoakControls::AskForThumbnails() {
    Measure("EnumAppThumbnail", [this] { return m_ofApplications.AskForApplications(); });
    SoakScene scene = m_desk.Scene();
    std::vector<unsigned>& windows = scene.strangersWindows;
    windows.insert(windows.end(), scene.shownWindows.begin(), scene.shownWindows.end());
    windows.push_back(scene.guestWindow);
    Measure("EnumWindowThumbnail", [&] { return m_ofWindows.AskForWindows(windows); });
}

// ---- The thread

void SoakControls::Start() {
    m_thread = std::thread([this] { Run(); });
}

void SoakControls::Stop() {
    {
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_ends = true;
    }
    m_ending.notify_all();
    if (m_thread.joinable())
        m_thread.join();
}

void SoakControls::Run() {
    for (int actions = 0; Wait(PACE) && Failure().empty(); ++actions) {
        ActOnce();
        if (actions % ACTIONS_PER_REQUEST == 0)
            AskForThumbnails();
    }
}

void SoakControls::ActOnce() {
    std::size_t chosen = Random(m_weights);
    for (const Action& action : m_actions) {
        const auto weight = static_cast<std::size_t>(action.weight);
        if (chosen < weight)
            return action.act();
        chosen -= weight;
    }
}

bool SoakControls::Wait(std::chrono::milliseconds time) {
    std::unique_lock<std::mutex> lock(m_mutex);
    return !m_ending.wait_for(lock, time, [this] { return m_ends; });
}

void SoakControls::Insist(const std::string& name, int result) {
    if (result >= 0)
        return;
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_failure = name + " gave " + std::to_string(result);
}

bool SoakControls::HasAskedForThumbnails() const {
    return m_calls.at("EnumWindowThumbnail").latency.Count() > 0;
}

SoakShare& SoakControls::AnyShare(SHARE_CAPTURE_ENGINE_TYPE type) {
    for (;;) {
        SoakShare& share = AnyShare();
        if (share.Plan().type == type)
            return share;
    }
}

unsigned SoakControls::AnyWindow() {
    const std::vector<unsigned> windows = m_desk.Scene().strangersWindows;
    return windows.empty() ? SHARE_INVALID_WINDOW : windows[Random(windows.size())];
}
