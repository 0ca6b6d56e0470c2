// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/x11/child_process.h"

#include <sys/types.h>

#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <vector>

/// The programs that are compared, each a way of capturing that a user could choose.

/// What is looked at.
struct Subject {
    unsigned window = 0; ///< The whole screen for 0.
    int captures = 1;    ///< So many at once; none only where windows are listed.
};

struct Peer {
    /// How much it tells of itself.
    enum class Talk {
        Answers,  ///< A driver of ours: see driver.h.
        Progress, ///< Writes the number of its frames from time to time.
        Nothing,
    };
    using Command =
        std::function<std::vector<std::string>(const std::string& display, const Subject& subject)>;

    std::string name;
    Talk talk = Talk::Nothing;
    bool seesCovered = false; ///< The content of a window that others cover.
    Command command;
};

/// Those that are installed; the others are told on the standard output, by name. The first one is ours.
std::vector<Peer> FindPeers();
/// Whether it is one of the configurations of WebRTC's capturer, which ratios are taken to.
bool IsWebrtc(const Peer& peer);
/// Whether it compares frames to find what has changed.
bool ComparesFrames(const Peer& peer);

/// One of them at work on a display, to the end of this object.
/// Errors: std::runtime_error, when it doesn't get there and when it has ended.
class RunningPeer {
public:
    /// Comes back when it delivers frames, if that can be told.
    RunningPeer(const Peer& peer, const std::string& display, const Subject& subject);
    ~RunningPeer();
    RunningPeer(const RunningPeer&) = delete;
    RunningPeer& operator=(const RunningPeer&) = delete;

    const std::string& Name() const { return m_peer.name; }
    pid_t Pid() const { return m_process->Pid(); }
    bool CountsFrames() const { return m_peer.talk != Peer::Talk::Nothing; }
    bool TellsPixels() const { return m_peer.talk == Peer::Talk::Answers; }
    /// So far.
    int Frames();
    /// Of the next frame, 0xRRGGBB.
    std::uint32_t PixelAt(int x, int y);

    struct Listing {
        int windows = 0;
        double microseconds = 0; ///< Wall time of one list.
    };
    Listing List(int times);

    /// Resident at most so far, in megabytes: shared memory included.
    double PeakMegabytes() const;

private:
    class Lines;

    std::string Ask(const std::string& request);
    void WaitUntilReady();
    int ReadProgress(int atLeast);
    [[noreturn]] void Fail(const std::string& what) const;

    const Peer m_peer;
    const CScratchFolder m_folder; // its log
    std::unique_ptr<Lines> m_lines;
    std::unique_ptr<CChildProcess> m_process;
    int m_frames = 0;
};
