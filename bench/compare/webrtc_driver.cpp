// SPDX-License-Identifier: Apache-2.0
#include "bench/compare/driver.h"

#include <modules/desktop_capture/desktop_and_cursor_composer.h>
#include <modules/desktop_capture/desktop_capture_options.h>
#include <modules/desktop_capture/desktop_capturer.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <climits>
#include <cstdint>
#include <memory>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>
#include <vector>

/// The desktop capturer of WebRTC as its clients use it: a loop of their own calls it thirty times a second,
/// the pointer is composed into each frame, and each frame is kept until the next one is there.
/// Configurations: words joined by "+", of `updates` (it listens for what changes) and `detect` (it compares
/// frames to find what has changed).

namespace {

using webrtc::DesktopAndCursorComposer;
using webrtc::DesktopCaptureOptions;
using webrtc::DesktopCapturer;
using webrtc::DesktopFrame;

constexpr int FRAMES_PER_SECOND = 30;

DesktopCaptureOptions OptionsOf(const std::string& config) {
    DesktopCaptureOptions options = DesktopCaptureOptions::CreateDefault();
    options.set_use_update_notifications(config.find("updates") != std::string::npos);
    options.set_detect_updated_region(config.find("detect") != std::string::npos);
    return options;
}

class Capture final : public DesktopCapturer::Callback {
public:
    explicit Capture(const DriverPlan& plan) {
        const DesktopCaptureOptions options = OptionsOf(plan.config);
        std::unique_ptr<DesktopCapturer> capturer = plan.window != 0
                                                        ? DesktopCapturer::CreateWindowCapturer(options)
                                                        : DesktopCapturer::CreateScreenCapturer(options);
        if (capturer == nullptr)
            throw std::runtime_error("no capturer");
        m_composer = std::make_unique<DesktopAndCursorComposer>(std::move(capturer), options);
        if (plan.window != 0 &&
            !m_composer->SelectSource(static_cast<DesktopCapturer::SourceId>(plan.window)))
            throw std::runtime_error("the window can't be selected");
        m_composer->Start(this);
    }

    void Tick() { m_composer->CaptureFrame(); }
    FrameProbe& Probe() { return m_probe; }
    const FrameProbe& Probe() const { return m_probe; }

private:
    void OnCaptureResult(DesktopCapturer::Result result, std::unique_ptr<DesktopFrame> frame) override {
        if (result != DesktopCapturer::Result::SUCCESS || frame == nullptr)
            return;
        m_probe.Saw(frame->data(), frame->stride());
        m_last = std::move(frame);
    }

    FrameProbe m_probe;
    std::unique_ptr<DesktopFrame> m_last;
    std::unique_ptr<DesktopAndCursorComposer> m_composer;
};

class WebrtcDriver final : public Driver {
public:
    explicit WebrtcDriver(const DriverPlan& plan)
        : m_lister(DesktopCapturer::CreateWindowCapturer(OptionsOf(plan.config))) {
        for (int i = 0; i < plan.captures; ++i)
            m_captures.push_back(std::make_unique<Capture>(plan));
        m_thread = std::thread([this] { Run(); });
    }
    ~WebrtcDriver() override {
        m_ended = true;
        m_thread.join();
    }

    int Frames() const override {
        int least = INT_MAX;
        for (const auto& capture : m_captures)
            least = std::min(least, capture->Probe().Frames());
        return least;
    }
    std::uint32_t PixelAt(int x, int y) override { return m_captures.back()->Probe().PixelAt(x, y); }
    int ListWindows() override {
        DesktopCapturer::SourceList sources;
        if (m_lister == nullptr || !m_lister->GetSourceList(&sources))
            throw std::runtime_error("the windows can't be listed");
        return static_cast<int>(sources.size());
    }

private:
    void Run() {
        using Clock = std::chrono::steady_clock;
        const auto period = std::chrono::nanoseconds(std::chrono::seconds(1)) / FRAMES_PER_SECOND;
        Clock::time_point next = Clock::now();
        while (!m_ended) {
            for (const auto& capture : m_captures)
                capture->Tick();
            next = std::max(next + period, Clock::now());
            std::this_thread::sleep_until(next);
        }
    }

    const std::unique_ptr<DesktopCapturer> m_lister;
    std::vector<std::unique_ptr<Capture>> m_captures;
    std::atomic<bool> m_ended{false};
    std::thread m_thread;
};

} // namespace

int main(int argc, char** argv) {
    return RunDriver(argc, argv, [](const DriverPlan& plan) { return std::make_unique<WebrtcDriver>(plan); });
}
