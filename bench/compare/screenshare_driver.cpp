// SPDX-License-Identifier: Apache-2.0
#include "bench/compare/driver.h"

#include <screenshare/share_engine.h>

#include <algorithm>
#include <climits>
#include <cstdint>
#include <memory>
#include <stdexcept>
#include <vector>

/// This library, as a client uses it: shares of the first monitor or of one window, each with an engine and a
/// sink of its own, in the default mode, thirty frames a second, with the pointer in them. No frame is held
/// back.

namespace {

constexpr unsigned FRAMES_PER_SECOND = 30;

class ProbingSink final : public IShareCaptureEngineSink {
public:
    FrameProbe& Probe() { return m_probe; }
    const FrameProbe& Probe() const { return m_probe; }

    void OnCaptureData(IShareFrame* frame, TVLRect&) override {
        if (frame->GetFrameDataFormat() == SHARE_FRAME_FORMAT_RGBA)
            m_probe.Saw(frame->GetFrameData(), frame->GetFrameLineBytes(), FrameProbe::Order::RedFirst);
    }
    void OnCaptureDisplaySizeChanged(TVLSize) override {}
    void OnCapturedWindowListChanged(const unsigned*, int) override {}
    void OnCaptureStatusChanged(int) override {}
    void OnCaptureError(int) override {}
    void OnCapturePositionChanged(int, int, int, int) override {}
    void OnCaptureEvent(int, int, void*) override {}

private:
    FrameProbe m_probe;
};

struct DestroyEngine {
    void operator()(IShareCaptureEngine* engine) const { DestroyShareCaptureEngine(engine); }
};

class Share {
public:
    explicit Share(unsigned window)
        : m_engine(CreateShareCaptureEngine(window != 0 ? SHARE_CAPTURE_ENGINE_TYPE_WINDOW
                                                        : SHARE_CAPTURE_ENGINE_TYPE_DESKTOP)) {
        const bool chosen =
            window != 0 ? m_engine->AddSharedWindow(window) == SHARE_RESULT_OK : ChooseFirstMonitor();
        m_engine->SetCaptureFps(FRAMES_PER_SECOND);
        if (!chosen || m_engine->SetSink(&m_sink) != SHARE_RESULT_OK || m_engine->Start() != SHARE_RESULT_OK)
            throw std::runtime_error("the share doesn't start");
    }

    FrameProbe& Probe() { return m_sink.Probe(); }
    const FrameProbe& Probe() const { return m_sink.Probe(); }

private:
    bool ChooseFirstMonitor() {
        IShareSourceEnumerator* const monitors =
            CreateShareSourceEnumerator(SHARE_SOURCE_ENUMERATOR_TYPE_MONITOR, false);
        monitors->Refresh();
        IShareSource* monitor = nullptr;
        bool chosen = monitors->GetSource(0, &monitor) == SHARE_RESULT_OK;
        if (chosen) {
            chosen = m_engine->AddCaptureShareSource(monitor) == SHARE_RESULT_OK;
            monitor->Release();
        }
        DestroyShareSourceEnumerator(monitors);
        return chosen;
    }

    ProbingSink m_sink;
    const std::unique_ptr<IShareCaptureEngine, DestroyEngine> m_engine;
};

class CountingWalk final : public ITvlEnumWindowsCallback {
public:
    int Windows() const { return m_windows; }

    bool OnWindow(unsigned window) override {
        m_info.structSize = sizeof m_info;
        m_windows += ShareGetWindowInfo(window, &m_info) == SHARE_RESULT_OK ? 1 : 0;
        return true;
    }

private:
    int m_windows = 0;
    ShareWindowInfo m_info{};
};

class ScreenshareDriver final : public Driver {
public:
    explicit ScreenshareDriver(const DriverPlan& plan) {
        for (int i = 0; i < plan.captures; ++i)
            m_shares.push_back(std::make_unique<Share>(plan.window));
    }

    int Frames() const override {
        int least = INT_MAX;
        for (const auto& share : m_shares)
            least = std::min(least, share->Probe().Frames());
        return least;
    }
    std::uint32_t PixelAt(int x, int y) override { return m_shares.back()->Probe().PixelAt(x, y); }
    /// With place and title of each, as for a picker.
    int ListWindows() override {
        CountingWalk walk;
        if (TvlEnumWindows(&walk, SHARE_WINDOW_ENUM_NORMAL) != SHARE_RESULT_OK)
            throw std::runtime_error("the windows can't be listed");
        return walk.Windows();
    }

private:
    std::vector<std::unique_ptr<Share>> m_shares;
};

} // namespace

int main(int argc, char** argv) {
    ShareEngineInit();
    const int status = RunDriver(
        argc, argv, [](const DriverPlan& plan) { return std::make_unique<ScreenshareDriver>(plan); });
    ShareEngineUninit();
    return status;
}
