// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/simulated/scene.h"
#include "tests/security/scarce_memory.h"
#include "tests/src/mac/avfoundation/session_bench.h"
#include "tests/src/mac/desktop_share_client.h"
#include "tests/src/mac/share_pointing_mouse_mac_tools.h"
#include "tests/support/threads.h"

#include <screenshare/share_engine.h>

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <cstdint>
#include <ostream>
#include <string>

/// What is shared, and how it is captured.
struct FaultKind {
    SHARE_CAPTURE_ENGINE_TYPE engine = SHARE_CAPTURE_ENGINE_TYPE_DESKTOP;
    SCREEN_CAPTURER_TYPE mode = SCREEN_CAPTURER_TYPE_DEFAULT;

    bool IsOfSession() const {
        return mode == SCREEN_CAPTURER_TYPE_AVFOUNDATION || mode == SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX;
    }
};

inline std::string NameOf(const FaultKind& kind) {
    const char* const engine = kind.engine == SHARE_CAPTURE_ENGINE_TYPE_DESKTOP ? "Desktop"
                               : kind.engine == SHARE_CAPTURE_ENGINE_TYPE_APP   ? "App"
                                                                                : "Window";
    return engine + ("Mode" + std::to_string(kind.mode));
}

inline void PrintTo(const FaultKind& kind, std::ostream* out) {
    *out << NameOf(kind);
}

/// The kinds of engines in the default mode, and every mode for a desktop and an application.
inline auto FaultKinds() {
    return testing::Values(
        FaultKind{}, FaultKind{SHARE_CAPTURE_ENGINE_TYPE_APP}, FaultKind{SHARE_CAPTURE_ENGINE_TYPE_WINDOW},
        FaultKind{SHARE_CAPTURE_ENGINE_TYPE_DESKTOP, SCREEN_CAPTURER_TYPE_CGS_GCD},
        FaultKind{SHARE_CAPTURE_ENGINE_TYPE_APP, SCREEN_CAPTURER_TYPE_CGS_GCD},
        FaultKind{SHARE_CAPTURE_ENGINE_TYPE_DESKTOP, SCREEN_CAPTURER_TYPE_AVFOUNDATION},
        FaultKind{SHARE_CAPTURE_ENGINE_TYPE_APP, SCREEN_CAPTURER_TYPE_AVFOUNDATION},
        FaultKind{SHARE_CAPTURE_ENGINE_TYPE_DESKTOP, SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX},
        FaultKind{SHARE_CAPTURE_ENGINE_TYPE_APP, SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX});
}

/// Hands everything on to another sink, which finds memory however little there is for the library.
class CPlentifulSink final : public IShareCaptureEngineSink {
public:
    explicit CPlentifulSink(IShareCaptureEngineSink& sink) : m_sink(sink) {}

    void OnCaptureDisplaySizeChanged(TVLSize size) override {
        const CPlentyScope plenty;
        m_sink.OnCaptureDisplaySizeChanged(size);
    }
    void OnCapturedWindowListChanged(const unsigned* windows, int count) override {
        const CPlentyScope plenty;
        m_sink.OnCapturedWindowListChanged(windows, count);
    }
    void OnCaptureStatusChanged(int status) override {
        const CPlentyScope plenty;
        m_sink.OnCaptureStatusChanged(status);
    }
    void OnCaptureData(IShareFrame* frame, TVLRect& rcUpdate) override {
        const CPlentyScope plenty;
        m_sink.OnCaptureData(frame, rcUpdate);
    }
    void OnCaptureError(int code) override {
        const CPlentyScope plenty;
        m_sink.OnCaptureError(code);
    }
    void OnCapturePositionChanged(int x, int y, int width, int height) override {
        const CPlentyScope plenty;
        m_sink.OnCapturePositionChanged(x, y, width, height);
    }
    void OnCaptureEvent(int type, int value, void* data) override {
        const CPlentyScope plenty;
        m_sink.OnCaptureEvent(type, value, data);
    }

private:
    IShareCaptureEngineSink& m_sink;
};

/// A share on a simulated desktop, on a clock that stands still: an editor's text on a wallpaper, and a
/// secret of somebody else in front of a part of it, which is kept out. Pure red is the secret's colour and
/// nothing else has any red.
class FaultBench {
public:
    static constexpr unsigned MAIN = 1;
    static constexpr unsigned SIDE = 2;
    static constexpr pid_t DESKTOP = 5'000'001;
    static constexpr pid_t EDITOR = 5'000'100;
    static constexpr pid_t SECRETS = 5'000'200;
    static constexpr platform::CGWindowID TEXT = 2;
    static constexpr platform::CGWindowID SECRET = 3;
    static constexpr platform::CGWindowID SIDE_WALLPAPER = 4;
    static constexpr std::uint32_t RED = 0xFF0000;
    static constexpr std::uint32_t GREEN = 0x00FF00;
    static constexpr int TEXT_PIXELS = 30 * 20;
    static constexpr int COVERED_PIXELS = 15 * 10;

    static platform::Scene Desk() {
        return platform::Scene()
            .Display(0, 0, 80, 50)
            .Display(80, 0, 40, 30)
            .App(DESKTOP, "Desktop")
            .Window(1)
            .At(0, 0, 80, 50)
            .Colour(0x008080)
            .Level(platform::SIMULATED_LEVEL_DESKTOP)
            .Window(SIDE_WALLPAPER)
            .At(80, 0, 40, 30)
            .Colour(0x008080)
            .Level(platform::SIMULATED_LEVEL_DESKTOP)
            .App(EDITOR, "Editor")
            .Window(TEXT)
            .At(10, 10, 30, 20)
            .Colour(GREEN)
            .Pointer(1000, 1000)
            .App(SECRETS, "Secrets")
            .Window(SECRET)
            .At(25, 20, 30, 20)
            .Colour(RED);
    }

    explicit FaultBench(const FaultKind& kind = {}) : client(kind.engine), m_kind(kind) {
        client.Watch([this](const DeliveredShot& shot) { m_red += shot.Count(RED); });
        client->SetSink(&m_sink);
        ShareText();
        if (kind.mode != SCREEN_CAPTURER_TYPE_DEFAULT) {
            EXPECT_EQ(client->SetCaptureMode(kind.mode), 0);
        }
    }
    ~FaultBench() {
        EXPECT_EQ(client->SetSink(nullptr), 0);
        client.Watch(nullptr);
    }
    FaultBench(const FaultBench&) = delete;
    FaultBench& operator=(const FaultBench&) = delete;

    /// As a client tells it; what is in force already stays as it is.
    void ShareText() const {
        if (m_kind.engine == SHARE_CAPTURE_ENGINE_TYPE_APP) {
            EXPECT_EQ(client->AddSharedProcess(static_cast<unsigned>(EDITOR)), 0);
        } else if (m_kind.engine == SHARE_CAPTURE_ENGINE_TYPE_WINDOW) {
            EXPECT_EQ(client->AddSharedWindow(TEXT), 0);
        } else {
            EXPECT_EQ(client->SelectSharedDisplay(MAIN), 0);
            EXPECT_EQ(client->AddUnSharedProcess(static_cast<unsigned>(SECRETS)), 0);
        }
    }

    /// Which has the capturer made anew, by what the whole process captures with since another engine was
    /// made.
    void TellModeAnew() const {
        EXPECT_EQ(client->SetCaptureMode(m_kind.mode == SCREEN_CAPTURER_TYPE_CGS_GCD
                                             ? SCREEN_CAPTURER_TYPE_AVFOUNDATION
                                             : SCREEN_CAPTURER_TYPE_CGS_GCD),
                  0);
        EXPECT_EQ(client->SetCaptureMode(m_kind.mode), 0);
        SettleWorker();
    }

    void SetSink(bool isWanted = true) { client->SetSink(isWanted ? &m_sink : nullptr); }
    void Start() {
        EXPECT_EQ(client->Start(), 0);
        SettleWorker();
    }
    void SettleWorker() const {
        if (const auto worker = WorkerOf(*client))
            Settle(*worker);
    }

    /// Until everybody has heard of what has happened to the desktop so far: a clock that is moved by hand
    /// does not wait for whoever tells it.
    void AwaitNotices() { EXPECT_TRUE(NoticesAreDelivered(*desktop.operator->())); }

    /// A period, with something new to see in it, and what it brings about.
    void Tick() {
        m_colour ^= 1;
        EXPECT_TRUE(desktop->SetContent(TEXT, platform::SimulatedContent::Colour(m_colour)));
        TickWithoutNews();
    }
    void TickWithoutNews() {
        clock->Advance(std::chrono::milliseconds(200));
        SettleWorker();
        if (m_kind.mode != SCREEN_CAPTURER_TYPE_DEFAULT)
            AwaitAllSamples();
    }

    /// Whether frames come that show the text of now and nothing of the secret, soon enough.
    [[nodiscard]] testing::AssertionResult ShowsText() {
        constexpr int TICKS = 30;
        std::size_t frames = 0;
        for (int i = 0; i < TICKS; ++i) {
            const std::size_t before = client.sink.FrameCount();
            Tick();
            const std::size_t got = client.sink.FrameCount() - before;
            if (got > 0 && IsText(client.Last()))
                return testing::AssertionSuccess();
            frames += got;
        }
        testing::AssertionResult failure = testing::AssertionFailure();
        failure << frames << " frames in " << TICKS << " periods, mode " << client.Statistic().eCaptureMode;
        if (frames == 0)
            return failure;
        const DeliveredShot last = client.Last();
        return failure << "; of the last one " << last.Count(m_colour) << " pixels show the text, "
                       << last.Count(m_colour ^ 1) << " what it was before, " << last.Count(RED)
                       << " the secret";
    }

    /// Pixels of the secret in all frames so far.
    int RedSoFar() const { return m_red; }
    void ForgetRed() { m_red = 0; }

    CManualClockScope clock;
    CSettingsScope settings;
    CServedScene desktop{Desk()};
    CShareClient client;

private:
    /// A queued picture is one period older; a mixed one may be so in parts.
    bool IsText(const DeliveredShot& shot) const {
        const bool mayBeLate = m_kind.mode != SCREEN_CAPTURER_TYPE_DEFAULT;
        const int pixels = shot.Count(m_colour) + (mayBeLate ? shot.Count(m_colour ^ 1) : 0);
        // A picture of the whole display can't show what lies behind something.
        const bool isFlat = m_kind.engine == SHARE_CAPTURE_ENGINE_TYPE_DESKTOP &&
                            client.Statistic().eCaptureMode == SCREEN_CAPTURER_TYPE_AVFOUNDATION;
        return pixels == (isFlat ? TEXT_PIXELS - COVERED_PIXELS : TEXT_PIXELS) && shot.Count(RED) == 0;
    }

    const FaultKind m_kind;
    std::atomic<int> m_red{0};
    std::uint32_t m_colour = GREEN;
    CPlentifulSink m_sink{client.sink};
};
