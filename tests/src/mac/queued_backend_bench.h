// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/dispatch.h"
#include "platform/platform_life.h"
#include "src/mac/share_capturer_cgs_gcd.h"
#include "src/mac/share_capturer_context_mac.h"
#include "tests/src/mac/backend_tools.h"
#include "tests/support/threads.h"

#include <screenshare/share_capturer.h>

#include <gtest/gtest.h>

#include <chrono>
#include <cstdint>
#include <memory>
#include <thread>

/// Keeps every thread of the dispatch pool busy: what is dispatched meanwhile waits.
class CClog {
public:
    CClog() {
        const platform::dispatch_queue_t queue =
            platform::dispatch_queue_create("clog", platform::DISPATCH_QUEUE_CONCURRENT);
        for (int i = 0; i < platform::DISPATCH_POOL_THREADS; ++i)
            platform::dispatch_async(queue, [state = m_state, i] {
                state->busy.Add();
                EXPECT_TRUE(state->leave.Reaches(i + 1));
            });
        EXPECT_TRUE(m_state->busy.Reaches(platform::DISPATCH_POOL_THREADS));
    }
    ~CClog() { Open(); }
    CClog(const CClog&) = delete;
    CClog& operator=(const CClog&) = delete;

    /// Frees one thread, which runs what waits one after the other; the rest follow at the end.
    void OpenOne() { m_state->leave.Add(); }
    void Open() {
        while (m_state->leave.Count() < platform::DISPATCH_POOL_THREADS)
            OpenOne();
    }

private:
    /// The threads may be leaving when the clog has gone.
    struct State {
        CTally busy;
        CTally leave; // so many may
    };
    const std::shared_ptr<State> m_state = std::make_shared<State>();
};

/// A queued back-end on a simulated desktop, on a clock that stands still. How long a picture takes is
/// scripted.
class QueuedBackEnd : public testing::Test {
protected:
    using Operation = platform::SimulatedOperation;
    using ms = std::chrono::milliseconds;

    static constexpr unsigned MAIN = 1;
    static constexpr unsigned SIDE = 2;
    static constexpr pid_t EDITOR = 5'000'100;
    static constexpr pid_t NOTES = 5'000'200;
    static constexpr std::uint32_t RED = 0xFF0000;
    static constexpr std::uint32_t GREEN = 0x00FF00;
    static constexpr platform::CGWindowID EDITOR_WINDOW = 1;
    static constexpr auto OK = static_cast<unsigned>(SHARE_CAPTURE_OK);
    static constexpr auto FAILED = static_cast<unsigned>(SHARE_CAPTURE_FAILED);
    static constexpr auto DRAGGING = static_cast<unsigned>(SHARE_CAPTURE_DRAGGING);
    static constexpr auto NOT_READY = static_cast<unsigned>(SHARE_CAPTURE_NOT_READY);

    /// Two displays; the editor's green window on the first one.
    static platform::Scene Desk() {
        return platform::Scene()
            .Display(0, 0, 200, 120)
            .Display(200, 10, 100, 50)
            .Scale(2)
            .App(EDITOR, "Editor")
            .Window(EDITOR_WINDOW)
            .At(50, 40, 80, 40)
            .Colour(GREEN)
            .Pointer(1000, 1000);
    }

    QueuedBackEnd() { EXPECT_TRUE(backEnd->init(context)); }
    ~QueuedBackEnd() override {
        desktop->Heal(Operation::TakeWindowPicture);
        clock->Advance(ms(10'000));
        platform::Rest();
    }

    unsigned Tick() { return backEnd->captureToIShareFrame(frame.Get()); }
    void ShareApp(pid_t pid = EDITOR) {
        context->AddSharedDisplay(MAIN);
        context->AddSharedApp(static_cast<unsigned>(pid));
    }

    /// Each capture that is on its way, or waits to begin, has a share of the back-end.
    long OnTheirWay() const { return backEnd.use_count() - 1; }
    [[nodiscard]] bool Settles(long onTheirWay = 0) const {
        return Comes([&] { return OnTheirWay() == onTheirWay; });
    }
    unsigned Pictures() const { return desktop->CallsOf(Operation::TakeWindowPicture); }
    /// Whether so many pictures have been begun.
    [[nodiscard]] bool Begins(unsigned pictures) const {
        return Comes([&] { return Pictures() >= pictures; });
    }
    template <class Condition>
    [[nodiscard]] static bool Comes(Condition condition) {
        const auto deadline = std::chrono::steady_clock::now() + PATIENCE;
        while (!condition() && std::chrono::steady_clock::now() < deadline)
            std::this_thread::yield();
        return condition();
    }

    void Advance(int milliseconds) { clock->Advance(ms(milliseconds)); }
    void Paint(std::uint32_t rgb) {
        desktop->SetContent(EDITOR_WINDOW, platform::SimulatedContent::Colour(rgb));
    }
    /// Begins a capture whose picture takes so long.
    void BeginPicture(int milliseconds) {
        const unsigned before = Pictures();
        desktop->DelayNext(Operation::TakeWindowPicture, ms(milliseconds));
        Tick();
        ASSERT_TRUE(Begins(before + 1));
    }
    /// Has so many pictures be finished that nobody has fetched: the window is blue in them, 1, 2, 3, …
    void FinishPictures(int count) {
        constexpr int LENGTH = 300;
        constexpr int APART = 10;
        for (int i = 0; i < count; ++i) {
            BeginPicture(LENGTH);
            Advance(APART);
        }
        Advance(LENGTH - count * APART - 1);
        for (int i = 1; i <= count; ++i) {
            Paint(static_cast<std::uint32_t>(i));
            Advance(i == 1 ? 1 : APART);
            ASSERT_TRUE(Settles(count - i));
        }
    }
    /// What the frame shows of the editor's window, 0xRRGGBB.
    std::uint32_t Shown() { return PixelAt(*frame.Get(), 60, 50).rgb; }

    CManualClockScope clock;
    CSettingsScope settings;
    CServedScene desktop{Desk()};
    std::shared_ptr<ShareCapturerContext> context = std::make_shared<ShareCapturerContextMac>();
    std::shared_ptr<ShareCapturerCGSGCD> backEnd = std::make_shared<ShareCapturerCGSGCD>();
    FrameRef frame = NewFrameRef();
};
