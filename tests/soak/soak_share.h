// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/soak/soak_desk.h"
#include "tests/soak/soak_histogram.h"

#include <screenshare/share_engine.h>

#include <array>
#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <string>

/// What one of the engines shares, and how.
struct SoakPlan {
    const char* name;
    SHARE_CAPTURE_ENGINE_TYPE type;
    SCREEN_CAPTURER_TYPE mode;
    std::size_t monitor; ///< 0 or 1: where what it shares lies.
};

/// Each kind of share and each mode, so that every mode is there twice.
constexpr std::array<SoakPlan, 8> SOAK_PLANS{{
    {"desktop, default", SHARE_CAPTURE_ENGINE_TYPE_DESKTOP, SCREEN_CAPTURER_TYPE_DEFAULT, 0},
    {"desktop, session", SHARE_CAPTURE_ENGINE_TYPE_DESKTOP, SCREEN_CAPTURER_TYPE_AVFOUNDATION, 1},
    {"desktop, queued", SHARE_CAPTURE_ENGINE_TYPE_DESKTOP, SCREEN_CAPTURER_TYPE_CGS_GCD, 1},
    {"desktop, mix", SHARE_CAPTURE_ENGINE_TYPE_DESKTOP, SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX, 0},
    {"application, default", SHARE_CAPTURE_ENGINE_TYPE_APP, SCREEN_CAPTURER_TYPE_DEFAULT, 0},
    {"application, mix", SHARE_CAPTURE_ENGINE_TYPE_APP, SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX, 0},
    {"window, queued", SHARE_CAPTURE_ENGINE_TYPE_WINDOW, SCREEN_CAPTURER_TYPE_CGS_GCD, 1},
    {"window, session", SHARE_CAPTURE_ENGINE_TYPE_WINDOW, SCREEN_CAPTURER_TYPE_AVFOUNDATION, 0},
}};

/// An engine that captures, and its sink.
/// Threads: one for everything but what is told of frames and errors, which is for any.
class SoakShare final : public IShareCaptureEngineSink {
public:
    using Clock = std::chrono::steady_clock;

    /// What is given outlives it. `counts` tells when frames are counted.
    SoakShare(const SoakPlan& plan, unsigned framesPerSecond, const SoakDesk& desk,
              const std::atomic<bool>& counts)
        : m_plan(plan),
          m_framesPerSecond(framesPerSecond),
          m_desk(desk),
          m_counts(counts) {}
    ~SoakShare() { Destroy(); }
    SoakShare(const SoakShare&) = delete;
    SoakShare& operator=(const SoakShare&) = delete;

    const SoakPlan& Plan() const { return m_plan; }
    /// Null before Create, and when that has failed.
    IShareCaptureEngine* Engine() const { return m_engine; }

    int Create();
    /// All that an engine is told before its Start. The first refusal, or 0.
    int Prepare(unsigned display);
    int Start();
    int Destroy();
    /// The time up to the next frame says nothing.
    void Interrupt() { m_lastFrame = 0; }

    /// Since `counts` is true.
    std::uint64_t Frames() const { return m_frames; }
    /// How far the time from frame to frame is from what was asked for, while windows stand still.
    const SoakHistogram& CalmJitter() const { return m_calmJitter; }
    /// The same while they move, when frames are also held back.
    const SoakHistogram& LivelyJitter() const { return m_livelyJitter; }
    /// Errors that it was told of.
    std::uint64_t Errors() const { return m_errors; }
    bool HasShownAnything() const { return m_hasShown; }

    void OnCaptureData(IShareFrame* frame, TVLRect& rcUpdate) override;
    void OnCaptureError(int) override { ++m_errors; }
    void OnCaptureDisplaySizeChanged(TVLSize) override {}
    void OnCapturedWindowListChanged(const unsigned*, int) override {}
    void OnCaptureStatusChanged(int) override {}
    void OnCapturePositionChanged(int, int, int, int) override {}
    void OnCaptureEvent(int, int, void*) override {}

private:
    const SoakPlan m_plan;
    const unsigned m_framesPerSecond;
    const SoakDesk& m_desk;
    const std::atomic<bool>& m_counts;
    IShareCaptureEngine* m_engine = nullptr;
    std::atomic<Clock::rep> m_lastFrame{0};
    std::atomic<std::uint64_t> m_frames{0};
    std::atomic<std::uint64_t> m_errors{0};
    std::atomic<bool> m_hasShown{false};
    std::atomic<bool> m_wasCalm{false};
    SoakHistogram m_calmJitter;
    SoakHistogram m_livelyJitter;
};
