// SPDX-License-Identifier: Apache-2.0
#include "bench/compare/compare_rows.h"

#include "bench/meter/cpu_meter.h"
#include "bench/meter/shared_picture.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <iterator>
#include <stdexcept>
#include <thread>
#include <utility>

namespace {

const std::string PREFIX = "compare/";
/// What the server and the scene do after a peer has gone is over then.
constexpr std::chrono::milliseconds CLEARING{700};

struct Goal {
    const char* scene;
    double screen;
    double window;
};

/// Of our cost to that of WebRTC's best configuration.
constexpr std::array<Goal, 4> GOALS{
    {{"static", 0.5, 0.15}, {"typing", 0.65, 0.2}, {"video", 0.8, 0.75}, {"full_motion", 0.85, 0.65}}};

std::optional<double> GoalOf(const Scene& scene) {
    for (const Goal& goal : GOALS) {
        if (scene.name == goal.scene)
            return scene.covered ? goal.window : goal.screen;
    }
    return std::nullopt;
}

std::string WithDigits(double part) {
    std::array<char, 16> text{};
    std::snprintf(text.data(), text.size(), "%.4f", part);
    return text.data();
}

/// How many of the ticks had a frame. Of those that tell their frames only now and then, it is too rough to
/// be used.
double ShareOfTicks(const Peer& peer, const Cost& cost) {
    if (peer.talk != Peer::Talk::Answers)
        return 1;
    if (!(cost.framesPerSecond > 0))
        throw std::runtime_error(peer.name + " delivers no frames any more");
    return cost.framesPerSecond / TICKS_PER_SECOND;
}

template <class Predicate>
std::vector<Peer> Those(const std::vector<Peer>& peers, const Predicate& wanted) {
    std::vector<Peer> those;
    std::copy_if(peers.begin(), peers.end(), std::back_inserter(those), wanted);
    return those;
}

} // namespace

Comparison::Comparison(const XServer& server, const BenchOptions& options, std::vector<Peer> peers,
                       BenchResults& results)
    : m_server(server),
      m_options(options),
      m_peers(std::move(peers)),
      m_results(results) {}

void Comparison::RunShares() {
    const std::vector<Peer> ofWindows = Those(
        m_peers, [](const Peer& peer) { return peer.seesCovered && peer.name != "webrtc updates+detect"; });
    for (const bool covered : {false, true}) {
        for (Scene scene : MovingScenes()) {
            scene.covered = covered;
            Run({(covered ? "window/" : "screen/") + scene.name,
                 scene,
                 {},
                 covered ? ofWindows : m_peers,
                 GoalOf(scene)});
        }
    }
}

void Comparison::RunSmallWindows() {
    constexpr int WIDTH = 800;
    constexpr int HEIGHT = 600;
    for (const Scene& scene : {Scene{"static", 0, 0, 0, 0, true, WIDTH, HEIGHT},
                               Scene{"typing", 300, 20, 10, 0, true, WIDTH, HEIGHT},
                               Scene{"full_motion", WIDTH, HEIGHT, 30, 0, true, WIDTH, HEIGHT}})
        Run({"small_window/" + scene.name, scene, {}, Rivals(), std::nullopt});
}

void Comparison::RunChanges() {
    for (const double part : {0.0, 1 / 64.0, 1 / 16.0, 1 / 4.0, 1 / 2.0, 1.0}) {
        const Scene scene = SceneOfChange(part, m_server.Options().width, m_server.Options().height);
        Run({"changed/" + WithDigits(part), scene, {}, Rivals(), std::nullopt});
    }
}

void Comparison::RunWindows() {
    for (const int count : {1, 10, 50, 200})
        Run({"windows/" + std::to_string(count), SceneOfWindows(count), {}, Rivals(), std::nullopt});
}

void Comparison::RunCaptures() {
    for (const int captures : {1, 2, 4}) {
        for (const Scene& scene : MovingScenes()) {
            if (scene.name == "static" || scene.name == "full_motion")
                Run({"captures/" + std::to_string(captures) + "/" + scene.name,
                     scene,
                     {0, captures},
                     Rivals(),
                     std::nullopt});
        }
    }
}

void Comparison::Run(const Plan& plan) {
    const std::string row = PREFIX + plan.row;
    if (!m_options.Wants(row))
        return;
    TellHeaderOnce();
    try {
        Measure(plan, row);
    } catch (const std::runtime_error& failure) {
        Fail(row, failure);
    }
}

void Comparison::Fail(const std::string& row, const std::exception& failure) {
    std::printf("%s FAILED: %s\n", row.c_str(), failure.what());
    std::fflush(stdout);
    m_succeeded = false;
}

void Comparison::Measure(Plan plan, const std::string& name) {
    ComparedRow row{name, {}, {}, plan.goal};
    SceneProcess playing(m_server.Display(), plan.scene);
    if (plan.scene.covered)
        plan.subject.window = playing.Window();
    for (const Peer& peer : plan.peers)
        row.peers.push_back({peer, {}, 0});
    std::vector<std::vector<Cost>> measured(row.peers.size());
    for (int i = 0; i < m_options.repeats; ++i) {
        std::this_thread::sleep_for(CLEARING);
        row.sceneAlone.push_back(MeasureCost({}, m_server.Pid(), m_options.seconds).server);
        for (std::size_t peer = 0; peer < row.peers.size(); ++peer)
            measured[peer].push_back(MeasureOne(plan, row.peers[peer]));
    }
    if (!playing.IsPlaying())
        throw std::runtime_error("the scene has ended before its time");
    const double alone = SpreadOf(row.sceneAlone).median;
    for (std::size_t peer = 0; peer < row.peers.size(); ++peer) {
        for (const Cost& cost : measured[peer])
            row.peers[peer].costs.Add(cost, alone, ShareOfTicks(row.peers[peer].peer, cost));
    }
    TellRow(row, m_results);
}

Cost Comparison::MeasureOne(const Plan& plan, PeerCosts& peer) const {
    RunningPeer running(peer.peer, m_server.Display(), plan.subject);
    if (running.TellsPixels())
        Verify(running, plan.scene);
    const auto frames = running.CountsFrames() ? std::function<int()>([&running] { return running.Frames(); })
                                               : std::function<int()>();
    const Cost cost = MeasureCost({running.Pid(), frames}, m_server.Pid(), m_options.seconds);
    peer.peakMegabytes = std::max(peer.peakMegabytes, running.PeakMegabytes());
    return cost;
}

/// Near the corner, where only a scene that moves everywhere changes anything.
void Comparison::Verify(RunningPeer& peer, const Scene& scene) const {
    constexpr int X = 43;
    constexpr int Y = 27;
    if (scene.windows > 0)
        return; // nothing is painted in that corner
    const int whole = scene.windowWidth > 0 ? scene.windowWidth : m_server.Options().width;
    const bool moves = scene.width >= whole;
    const std::uint32_t seen = peer.PixelAt(X, Y);
    const bool right = moves ? seen == ColourOfSquares(X, Y, 1) || seen == ColourOfSquares(X, Y, 2)
                             : seen == ColourOfSquares(X, Y, 0);
    if (!right)
        throw std::runtime_error("a frame of " + peer.Name() + " shows " + std::to_string(seen) +
                                 ", which is not in the scene '" + scene.name + "'");
}

std::vector<Peer> Comparison::Rivals() const {
    return Those(m_peers, [this](const Peer& peer) {
        return peer.name == m_peers.front().name || (IsWebrtc(peer) && !ComparesFrames(peer));
    });
}

void Comparison::RunLists() {
    constexpr int WINDOWS = 50;
    const std::string row = PREFIX + "list/" + std::to_string(WINDOWS);
    if (!m_options.Wants(row))
        return;
    try {
        ListAll(row, WINDOWS);
    } catch (const std::runtime_error& failure) {
        Fail(row, failure);
    }
}

void Comparison::ListAll(const std::string& row, int windows) {
    const SceneProcess scene(m_server.Display(), SceneOfWindows(windows));
    std::printf("\n%s: microseconds for each window of a list, medians [lowest .. highest]\n", row.c_str());
    std::vector<Peer> listers{m_peers.front()};
    const auto webrtc = std::find_if(m_peers.begin(), m_peers.end(), IsWebrtc);
    if (webrtc != m_peers.end())
        listers.push_back(*webrtc); // how it looks for changes makes no difference to lists
    for (const Peer& peer : listers)
        List(peer, row, windows);
}

void Comparison::List(const Peer& peer, const std::string& row, int windows) {
    constexpr int TIMES = 100;
    RunningPeer running(peer, m_server.Display(), {0, 0});
    running.List(1);
    std::vector<double> wall;
    std::vector<double> cpu;
    for (int i = 0; i < m_options.repeats; ++i) {
        const auto spent = [&] { return ReadCpuClock(running.Pid()) + ReadCpuClock(m_server.Pid()); };
        const auto before = spent();
        const RunningPeer::Listing listing = running.List(TIMES);
        const std::chrono::duration<double, std::micro> used = spent() - before;
        if (listing.windows != windows)
            throw std::runtime_error(peer.name + " lists " + std::to_string(listing.windows) + " windows");
        wall.push_back(listing.microseconds / windows);
        cpu.push_back(used.count() / TIMES / windows);
    }
    const Spread waited = SpreadOf(wall);
    const Spread spent = SpreadOf(cpu);
    std::printf("  %-22s wall %8.3f [%8.3f ..%8.3f]   CPU, server's included %8.3f [%8.3f ..%8.3f]\n",
                peer.name.c_str(), waited.median, waited.lowest, waited.highest, spent.median, spent.lowest,
                spent.highest);
    std::fflush(stdout);
    m_results.Add(row + "/" + peer.name, {{"wall_us", waited.median},
                                          {"wall_us_lowest", waited.lowest},
                                          {"wall_us_highest", waited.highest},
                                          {"cpu_us", spent.median},
                                          {"cpu_us_lowest", spent.lowest},
                                          {"cpu_us_highest", spent.highest},
                                          {"repeats", m_options.repeats}});
}

void Comparison::TellHeaderOnce() {
    if (!m_headerTold)
        TellCostsHeader();
    m_headerTold = true;
}
