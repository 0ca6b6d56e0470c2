// SPDX-License-Identifier: Apache-2.0
#include "src/thumbnail_capture_engine.h"

#include "tests/src/thumbnail_tools.h"
#include "tests/support/give_way.h"
#include "tests/support/test_effort.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <iostream>
#include <memory>
#include <random>
#include <thread>
#include <vector>

// After cancel has returned a callback hears nothing more, whatever the worker is at: callbacks are cancelled
// and destroyed while their jobs run, captures and calls being slow.

namespace {

constexpr unsigned SEED = 20260;

/// What became of a round; it outlives the callback.
struct Round {
    unsigned slowness = 0; ///< How often a call gives way to others.
    std::atomic<bool> isCancelled{false};
    std::atomic<int> entered{0};
    std::atomic<int> calls{0};
    std::atomic<int> lateCalls{0};
};

class CMortalCallback final : public ThumbnailCallback {
public:
    explicit CMortalCallback(Round& round) : m_round(round) {}
    ~CMortalCallback() { m_weight.assign(m_weight.size(), 1); }

    bool onAppThumbnail(unsigned, ImageData, bool, bool) override { return Take(); }
    bool onWindowThumbnail(unsigned, ImageData, bool, bool) override { return Take(); }
    bool onThumbnailError(int) override { return Take(); }

private:
    bool Take() {
        Round& round = m_round;
        ++round.entered;
        m_weight.assign(m_weight.size(), 2); // what a sanitizer sees when it comes beside the destructor
        GiveWay(round.slowness, std::chrono::milliseconds(10)); // longer than who calls meanwhile
        // Only now: a cancellation that has returned meanwhile has not waited for this call.
        ++(round.isCancelled ? round.lateCalls : round.calls);
        return true;
    }

    Round& m_round;
    std::vector<int> m_weight = std::vector<int>(16);
};

/// As it should be.
class CSoundEngine : public CPlannedEngine {
public:
    using CPlannedEngine::CPlannedEngine;
    static constexpr bool IS_SOUND = true;

    bool Request(std::vector<unsigned> windows, ThumbnailCallback& callback) {
        return RequestWindows(std::move(windows), callback);
    }
};

/// Its jobs don't look at the flags anew between the capture and the call.
class CCarelessEngine : public CPlannedEngine {
public:
    using CPlannedEngine::CPlannedEngine;
    static constexpr bool IS_SOUND = false;

    bool Request(std::vector<unsigned> windows, ThumbnailCallback& callback) {
        return append(&callback, [this, windows = std::move(windows), &callback](
                                     CThumbnailCapturer* capturer, std::recursive_mutex& mutex) {
            for (const unsigned window : windows) {
                if (IsJobEnded())
                    return;
                ImageData image{};
                const bool isCaptured = capturer->captureWindowImage(window, image);
                const std::lock_guard<std::recursive_mutex> lock(mutex);
                if (!callback.onWindowThumbnail(window, image, !isCaptured, window == windows.back()))
                    return;
            }
        });
    }
};

/// Its jobs look again, and call without the mutex: its cancel waits for no call.
class CHastyEngine : public CPlannedEngine {
public:
    using CPlannedEngine::CPlannedEngine;
    static constexpr bool IS_SOUND = false;

    bool Request(std::vector<unsigned> windows, ThumbnailCallback& callback) {
        return append(&callback, [this, windows = std::move(windows), &callback](CThumbnailCapturer* capturer,
                                                                                 std::recursive_mutex&) {
            for (const unsigned window : windows) {
                ImageData image{};
                const bool isCaptured = capturer->captureWindowImage(window, image);
                if (IsJobEnded() ||
                    !callback.onWindowThumbnail(window, image, !isCaptured, window == windows.back()))
                    return;
            }
        });
    }
};

struct Outcome {
    int calls = 0;
    int lateCalls = 0;
    int cutShort = 0; ///< Rounds that were cancelled before all was told.
};

/// In every other round the cancellation falls into a capture; in the others into the first call or behind
/// it, or anywhere.
template <class Engine>
Outcome Hammer(int rounds) {
    constexpr int WINDOWS = 4;
    ThumbnailPlan plan;
    std::atomic<int> captures{0};
    std::atomic<unsigned> slowness{0};            // how often a capture gives way to others
    std::atomic<const Round*> outlasted{nullptr}; // captures last until its cancellation
    plan.capture = [&](unsigned) {
        const Round* const until = outlasted;
        ++captures;
        while (until != nullptr && !until->isCancelled)
            std::this_thread::yield();
        GiveWay(slowness);
        return true;
    };
    Engine engine(plan);
    std::mt19937 random(SEED);
    Outcome outcome;
    std::vector<std::unique_ptr<Round>> records;
    std::vector<std::unique_ptr<CMortalCallback>> kept; // what is called too late must still be there
    for (int i = 0; i < rounds; ++i) {
        records.push_back(std::make_unique<Round>());
        Round& round = *records.back();
        auto callback = std::make_unique<CMortalCallback>(round);
        const bool isOutlasted = i % 2 == 0;
        outlasted = isOutlasted ? &round : nullptr;
        const int before = captures;
        slowness = static_cast<unsigned>(random() % 300);
        round.slowness = static_cast<unsigned>(random() % 100);
        EXPECT_TRUE(engine.Request({1, 2, 3, WINDOWS}, *callback));
        while (isOutlasted && captures == before)
            std::this_thread::yield();
        while (i % 4 == 1 && round.calls == 0)
            std::this_thread::yield();
        const bool isIntoCall = i % 4 == 3;
        while (isIntoCall && round.entered == 0)
            std::this_thread::yield();
        GiveWay(random() % (isIntoCall ? 10 : 400));
        engine.cancel(callback.get());
        round.isCancelled = true;
        if constexpr (Engine::IS_SOUND)
            callback.reset();
        else
            kept.push_back(std::move(callback));
    }
    engine.stop();
    for (const auto& round : records) {
        outcome.calls += round->calls;
        outcome.lateCalls += round->lateCalls;
        outcome.cutShort += round->calls < WINDOWS ? 1 : 0;
    }
    return outcome;
}

} // namespace

TEST(ThumbnailCancelHammer, NeverCallsACallbackAfterItsCancellation) {
    const int rounds = TestRounds(1000);
    const Outcome outcome = Hammer<CSoundEngine>(rounds);
    std::cout << rounds << " rounds, seed " << SEED << ": " << outcome.calls << " calls, " << outcome.cutShort
              << " rounds cut short\n";
    EXPECT_EQ(outcome.lateCalls, 0);
    EXPECT_GT(outcome.calls, 0) << "nothing was told at all";
    EXPECT_GT(outcome.cutShort, 0) << "no job was running when it was cancelled";
}

TEST(ThumbnailCancelHammer, CatchesAnEngineThatDoesNotLookAgainAfterACapture) {
    const int rounds = TestRounds(100);
    const Outcome outcome = Hammer<CCarelessEngine>(rounds);
    std::cout << rounds << " rounds, seed " << SEED << ": " << outcome.lateCalls << " late calls\n";
    EXPECT_GT(outcome.lateCalls, 0);
}

TEST(ThumbnailCancelHammer, CatchesAnEngineWhoseCancelWaitsForNoCall) {
    const int rounds = TestRounds(200);
    const Outcome outcome = Hammer<CHastyEngine>(rounds);
    std::cout << rounds << " rounds, seed " << SEED << ": " << outcome.lateCalls << " late calls\n";
    EXPECT_GT(outcome.lateCalls, 0);
}

TEST(ThumbnailCancelHammer, ServesSeveralClientsAtOnceUntilItIsStopped) {
    constexpr int CLIENTS = 3;
    const int rounds = TestRounds(60);
    ThumbnailPlan plan;
    plan.capture = [](unsigned id) {
        GiveWay(id * 10);
        return id % 2 == 0;
    };
    CSoundEngine engine(plan);
    std::atomic<int> taken{0};
    std::atomic<int> refused{0};
    std::atomic<int> lateCalls{0};
    CTally halfway;
    const auto serve = [&](unsigned client) {
        std::mt19937 random(SEED + client);
        for (int i = 0; i < rounds; ++i) {
            Round round;
            CMortalCallback callback(round);
            ++(engine.Request({1, 2, 3, 4}, callback) ? taken : refused);
            GiveWay(random() % 200);
            engine.cancel(&callback);
            round.isCancelled = true;
            std::this_thread::yield();
            lateCalls += round.lateCalls;
            if (i == rounds / 2)
                halfway.Add();
        }
    };
    std::vector<std::thread> threads;
    for (unsigned client = 0; client < CLIENTS; ++client)
        threads.emplace_back(serve, client);
    EXPECT_TRUE(halfway.Reaches(1));
    engine.stop();
    for (std::thread& thread : threads)
        thread.join();
    std::cout << CLIENTS << " clients of " << rounds << " rounds, seed " << SEED << ": " << taken
              << " requests taken, " << refused << " refused after the stop\n";
    EXPECT_EQ(lateCalls, 0);
    EXPECT_GT(taken, 0);
    EXPECT_EQ(plan.made.Count(), plan.ended.Count());
}
