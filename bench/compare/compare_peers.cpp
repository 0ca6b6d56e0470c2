// SPDX-License-Identifier: Apache-2.0
#include "bench/compare/compare_peers.h"

#include <fcntl.h>
#include <poll.h>
#include <unistd.h>

#include <array>
#include <chrono>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <optional>
#include <sstream>
#include <stdexcept>
#include <thread>
#include <utility>

namespace {

using Words = std::vector<std::string>;

constexpr int ANSWER_MS = 30000;
constexpr int FRAMES_BEFORE = 10;
/// For those that don't tell when they have begun.
constexpr std::chrono::milliseconds BEGINNING{2500};
/// What happens once at the beginning is over then.
constexpr std::chrono::milliseconds SETTLING{1000};
const std::string WEBRTC = "webrtc";

std::string BesideUs(const std::string& program) {
    return (std::filesystem::read_symlink("/proc/self/exe").parent_path() / program).string();
}

Peer DriverPeer(const std::string& name, const std::string& program, const std::string& config) {
    const auto command = [program, config](const std::string&, const Subject& subject) {
        Words words{BesideUs(program), "--captures=" + std::to_string(subject.captures),
                    "--window=" + std::to_string(subject.window)};
        if (!config.empty())
            words.push_back("--config=" + config);
        return words;
    };
    return {name, Peer::Talk::Answers, true, command};
}

/// Raw frames, neither converted nor kept.
Peer FfmpegPeer() {
    const auto command = [](const std::string& display, const Subject&) {
        return Words{"ffmpeg",
                     "-hide_banner",
                     "-nostdin",
                     "-loglevel",
                     "error",
                     "-nostats",
                     "-progress",
                     "pipe:1",
                     "-stats_period",
                     "0.25",
                     "-f",
                     "x11grab",
                     "-framerate",
                     "30",
                     "-draw_mouse",
                     "1",
                     "-i",
                     display,
                     "-c:v",
                     "copy",
                     "-f",
                     "null",
                     "-"};
    };
    return {"ffmpeg x11grab", Peer::Talk::Progress, false, command};
}

Peer GstreamerPeer(const std::string& name, bool useDamage) {
    const auto command = [useDamage](const std::string& display, const Subject&) {
        return Words{"gst-launch-1.0",
                     "-q",
                     "ximagesrc",
                     "display-name=" + display,
                     std::string("use-damage=") + (useDamage ? "true" : "false"),
                     "show-pointer=true",
                     "!",
                     "video/x-raw,framerate=30/1",
                     "!",
                     "fakesink"};
    };
    return {name, Peer::Talk::Nothing, false, command};
}

} // namespace

/// The pipes to a process and from it, and the lines in them.
class RunningPeer::Lines {
public:
    Lines() {
        if (pipe2(m_to.data(), O_CLOEXEC) != 0 || pipe2(m_from.data(), O_CLOEXEC) != 0)
            throw std::runtime_error("no pipe");
    }
    ~Lines() {
        for (const int end : {m_to[0], m_to[1], m_from[0], m_from[1]}) {
            if (end >= 0)
                close(end);
        }
    }
    Lines(const Lines&) = delete;
    Lines& operator=(const Lines&) = delete;

    int ChildsInput() const { return m_to[0]; }
    int ChildsOutput() const { return m_from[1]; }
    /// What the child has is closed here, so that its end is seen.
    void ChildHasItsEnds() {
        close(std::exchange(m_to[0], -1));
        close(std::exchange(m_from[1], -1));
    }

    bool Write(const std::string& line) const {
        const std::string bytes = line + '\n';
        return write(m_to[1], bytes.data(), bytes.size()) == static_cast<ssize_t>(bytes.size());
    }
    std::optional<std::string> Read(int milliseconds) {
        while (true) {
            const std::size_t end = m_read.find('\n');
            if (end != std::string::npos) {
                std::string line = m_read.substr(0, end);
                m_read.erase(0, end + 1);
                return line;
            }
            std::array<char, 4096> bytes{};
            pollfd readable{m_from[0], POLLIN, 0};
            if (poll(&readable, 1, milliseconds) != 1)
                return std::nullopt;
            const ssize_t length = read(m_from[0], bytes.data(), bytes.size());
            if (length <= 0)
                return std::nullopt;
            m_read.append(bytes.data(), static_cast<std::size_t>(length));
        }
    }

private:
    std::array<int, 2> m_to{{-1, -1}};
    std::array<int, 2> m_from{{-1, -1}};
    std::string m_read;
};

std::vector<Peer> FindPeers() {
    const std::string none;
    std::vector<Peer> peers;
    const auto add = [&peers](const std::string& program, const std::string& reason,
                              std::vector<Peer> found) {
        if (!FindProgram(program).empty())
            peers.insert(peers.end(), found.begin(), found.end());
        else
            std::printf("skipped: %s: %s\n", found.front().name.c_str(), reason.c_str());
    };
    peers.push_back(DriverPeer("screenshare", "screenshare_driver", none));
    add(BesideUs("webrtc_driver"), "built without libtgowt-dev",
        {DriverPeer(WEBRTC, "webrtc_driver", none), DriverPeer(WEBRTC + " detect", "webrtc_driver", "detect"),
         DriverPeer(WEBRTC + " updates", "webrtc_driver", "updates"),
         DriverPeer(WEBRTC + " updates+detect", "webrtc_driver", "updates+detect")});
    add("ffmpeg", "ffmpeg is not installed", {FfmpegPeer()});
    add("gst-launch-1.0", "gstreamer1.0-tools is not installed",
        {GstreamerPeer("gstreamer", false), GstreamerPeer("gstreamer damage", true)});
    peers.push_back(DriverPeer("bare loop", "bare_driver", none));
    peers.push_back(DriverPeer("bare loop updates", "bare_driver", "updates"));
    peers.back().seesCovered = false;
    return peers;
}

bool IsWebrtc(const Peer& peer) {
    return peer.name.compare(0, WEBRTC.size(), WEBRTC) == 0;
}

bool ComparesFrames(const Peer& peer) {
    return peer.name.find("detect") != std::string::npos;
}

RunningPeer::RunningPeer(const Peer& peer, const std::string& display, const Subject& subject)
    : m_peer(peer),
      m_lines(std::make_unique<Lines>()) {
    CChildProcess::Plan plan;
    plan.command = peer.command(display, subject);
    plan.environment = {{"DISPLAY", display}, {"SCREENSHARE_PLATFORM", "x11"}};
    plan.log = m_folder.File("log");
    plan.input = m_lines->ChildsInput();
    plan.output = m_lines->ChildsOutput();
    m_process = std::make_unique<CChildProcess>(plan);
    m_lines->ChildHasItsEnds();
    WaitUntilReady();
    std::this_thread::sleep_for(SETTLING);
    if (!m_process->IsRunning())
        Fail("has ended");
}

RunningPeer::~RunningPeer() {
    m_process->End();
}

void RunningPeer::WaitUntilReady() {
    if (m_peer.talk == Peer::Talk::Nothing)
        std::this_thread::sleep_for(BEGINNING);
    else if (m_peer.talk == Peer::Talk::Progress)
        ReadProgress(FRAMES_BEFORE);
    else if (m_lines->Read(ANSWER_MS) != "ready")
        Fail("delivers no frames");
}

/// Reads what is there, and waits until as many frames are told.
int RunningPeer::ReadProgress(int atLeast) {
    const std::string word = "frame=";
    while (const auto line = m_lines->Read(m_frames < atLeast ? ANSWER_MS : 0)) {
        if (line->compare(0, word.size(), word) == 0)
            m_frames = std::stoi(line->substr(word.size()));
    }
    if (m_frames < atLeast)
        Fail("delivers no frames");
    return m_frames;
}

std::string RunningPeer::Ask(const std::string& request) {
    if (!m_lines->Write(request))
        Fail("takes no requests");
    const auto answer = m_lines->Read(ANSWER_MS);
    if (!answer)
        Fail("doesn't answer '" + request + "'");
    return *answer;
}

int RunningPeer::Frames() {
    if (m_peer.talk == Peer::Talk::Nothing)
        return 0;
    return m_peer.talk == Peer::Talk::Progress ? ReadProgress(0) : std::stoi(Ask("frames"));
}

std::uint32_t RunningPeer::PixelAt(int x, int y) {
    return static_cast<std::uint32_t>(
        std::stoul(Ask("pixel " + std::to_string(x) + ' ' + std::to_string(y))));
}

RunningPeer::Listing RunningPeer::List(int times) {
    std::istringstream words(Ask("list " + std::to_string(times)));
    Listing listing;
    double nanoseconds = 0;
    words >> listing.windows >> nanoseconds;
    listing.microseconds = nanoseconds / 1000;
    return listing;
}

double RunningPeer::PeakMegabytes() const {
    std::ifstream file("/proc/" + std::to_string(m_process->Pid()) + "/status");
    std::string word;
    double kilobytes = 0;
    while (file >> word) {
        if (word == "VmHWM:")
            file >> kilobytes;
    }
    return kilobytes / 1000;
}

void RunningPeer::Fail(const std::string& what) const {
    std::ifstream file(m_folder.File("log"));
    const std::string log{std::istreambuf_iterator<char>(file), {}};
    throw std::runtime_error(m_peer.name + " " + what + (log.empty() ? "" : "; it says: " + log));
}
