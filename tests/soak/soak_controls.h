// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/soak/soak_desk.h"
#include "tests/soak/soak_histogram.h"
#include "tests/soak/soak_options.h"
#include "tests/soak/soak_share.h"
#include "tests/soak/soak_watchers.h"

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <random>
#include <string>
#include <thread>
#include <vector>

/// How long calls of one operation have taken, and how many were refused. Threads: any.
struct SoakCall {
    SoakHistogram latency;
    std::atomic<std::uint64_t> refused{0};
};

/// What a client does beside taking frames: now this, now that, on a thread of its own, to engines that
/// others share the desktop with.
class SoakControls {
public:
    using Shares = std::vector<std::unique_ptr<SoakShare>>;

    /// What is given outlives it. `counts` tells when calls are measured.
    SoakControls(const SoakOptions& options, const SoakDesk& desk, const Shares& shares,
                 const std::vector<unsigned>& displays, const std::atomic<bool>& counts);
    ~SoakControls() { Stop(); }
    SoakControls(const SoakControls&) = delete;
    SoakControls& operator=(const SoakControls&) = delete;

    void Start();
    void Stop();

    /// By operation.
    const std::map<std::string, SoakCall>& Calls() const { return m_calls; }
    /// Since `counts` is true.
    bool HasAskedForThumbnails() const;
    std::uint64_t Pictures() const { return m_ofApplications.Pictures() + m_ofWindows.Pictures(); }
    /// What must not be refused and was; empty without any.
    std::string Failure() const;

private:
    using Call = std::function<int(IShareCaptureEngine&)>;

    struct Action {
        int weight;
        std::function<void()> act;
    };

    void AddQuestions();
    void AddSettings();
    void AddContent();
    void AddLives();
    void AddPickers();
    /// A call of any engine.
    void AddCall(const std::string& name, int weight, const Call& call);
    /// First the one, after a while the other, of an engine of that kind.
    void AddPair(const std::string& first, const std::string& second, SHARE_CAPTURE_ENGINE_TYPE type,
                 const std::function<unsigned()>& argument, int (IShareCaptureEngine::*in)(unsigned),
                 int (IShareCaptureEngine::*out)(unsigned));
    void AddAction(const std::vector<std::string>& names, int weight, std::function<void()> act);
    int Measure(const std::string& name, const std::function<int()>& call);

    void ShrinkAndGrow(IShareCaptureEngine& engine);
    void PauseAndResume(SoakShare& share);
    void StopAndStart(SoakShare& share);
    void MakeAnew(SoakShare& share);
    void ListAnew();
    void AskForThumbnails();

    void Run();
    void ActOnce();
    /// False when it is over.
    bool Wait(std::chrono::milliseconds time);
    void Insist(const std::string& name, int result);

    std::size_t Random(std::size_t below) { return m_random() % below; }
    SoakShare& AnyShare() { return *m_shares[Random(m_shares.size())]; }
    SoakShare& AnyShare(SHARE_CAPTURE_ENGINE_TYPE type);
    unsigned AnyWindow();

    const unsigned m_framesPerSecond;
    const SoakDesk& m_desk;
    const Shares& m_shares;
    const std::vector<unsigned> m_displays;
    const std::atomic<bool>& m_counts;
    std::minstd_rand m_random;
    std::vector<Action> m_actions;
    std::size_t m_weights = 0;
    std::map<std::string, SoakCall> m_calls; // all there before the thread is
    SoakThumbnails m_ofApplications;
    SoakThumbnails m_ofWindows;

    mutable std::mutex m_mutex;
    std::condition_variable m_ending;
    bool m_ends = false;   // guarded by m_mutex
    std::string m_failure; // guarded by m_mutex
    std::thread m_thread;
};
