// SPDX-License-Identifier: Apache-2.0
#include "platform/simulated/scene.h"
#include "src/mac/cgs_composition.h"
#include "src/mac/share_capturer_context_mac.h"
#include "src/share_capture_engine_kinds.h"
#include "src/share_frame.h"
#include "util/cm_clock.h"

#include <screenshare/share_engine.h>

#include <sys/types.h>

#include <chrono>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <functional>
#include <map>
#include <memory>
#include <random>
#include <stdexcept>
#include <string>
#include <vector>

/// Steps whose instructions are counted by callgrind: unlike times, their number is the same on a busy
/// machine. Each runs on the simulated desktop, on one thread, by a clock that stands still meanwhile, so
/// every run does the same. bench/check_counts compares the numbers with those that are stored.
///
///     counted_passes        names the steps
///     counted_passes STEP   runs one of them, a few times within CountedStep

namespace {

constexpr int WIDTH = 960; // callgrind is slow
constexpr int HEIGHT = 540;
constexpr unsigned DISPLAY = 1;
constexpr pid_t SHARED_APP = 500;
constexpr pid_t OTHER_APP = 600;
constexpr platform::CGWindowID WIDE_WINDOW = 1;
constexpr platform::CGWindowID SMALL_WINDOW = 2;
constexpr std::chrono::milliseconds TICK{33};

// ---- The desktop

platform::SimulatedContent Squares(int width, int height, std::uint32_t seed) {
    std::vector<platform::SimulatedArgb> pixels;
    pixels.reserve(static_cast<std::size_t>(width) * static_cast<std::size_t>(height));
    for (int y = 0; y < height; ++y) {
        for (int x = 0; x < width; ++x) {
            const std::uint32_t square = static_cast<std::uint32_t>(x / 8 * 131 + y / 8 * 17);
            pixels.push_back(platform::Opaque(((square + seed * 7919U) * 0x9E3779B1U) >> 8));
        }
    }
    return platform::SimulatedContent::Pixels(width, height, std::move(pixels));
}

platform::Scene DesktopScene() {
    platform::Scene scene;
    scene.Display(0, 0, WIDTH, HEIGHT);
    scene.App(OTHER_APP, "Other").App(SHARED_APP, "Shared");
    scene.Window(WIDE_WINDOW).At(0, 0, WIDTH, HEIGHT).Showing(Squares(WIDTH, HEIGHT, 0));
    scene.Window(SMALL_WINDOW).At(330, 260, 300, 20).Showing(Squares(300, 20, 1));
    scene.Pointer(200, 150).Cursor(platform::ArrowCursor());
    return scene;
}

/// Scattered windows of two applications by turns.
platform::Scene SceneOfWindows(int count) {
    platform::Scene scene;
    scene.Display(0, 0, WIDTH, HEIGHT);
    std::mt19937 random(1);
    const auto pick = [&random](int below) {
        return static_cast<float>(random() % static_cast<unsigned>(below));
    };
    for (int i = 0; i < count; ++i) {
        const float left = pick(WIDTH - 200);
        const float top = pick(HEIGHT - 200);
        scene.Window(static_cast<unsigned>(i + 1))
            .Of(i % 2 == 0 ? SHARED_APP : OTHER_APP)
            .At(left, top, 200 + pick(800), 100 + pick(600));
    }
    return scene;
}

/// Serves a scene as long as it lives.
class Served {
public:
    explicit Served(const platform::Scene& scene)
        : m_server(scene.Serve()),
          m_former(platform::ReplaceWindowServer(m_server)) {}
    ~Served() { platform::ReplaceWindowServer(m_former); }
    Served(const Served&) = delete;
    Served& operator=(const Served&) = delete;

    platform::SimulatedWindowServer& Server() { return *m_server; }
    /// Has the simulated desktop paint what its windows show now: what that takes is not the product's.
    void PaintAhead() {
        platform::WindowPictureRequest request;
        request.keepsOut = false;
        request.windows = {WIDE_WINDOW, SMALL_WINDOW};
        request.rect = {{0, 0}, {WIDTH, HEIGHT}};
        request.deadline = CmSteadyNow() + platform::DEFAULT_IMAGE_DEADLINE;
        if (m_server->TakeWindowPicture(request).outcome != platform::PictureOutcome::Ok)
            throw std::runtime_error("the simulated desktop gives no picture");
    }

private:
    const std::shared_ptr<platform::SimulatedWindowServer> m_server;
    const std::shared_ptr<platform::WindowServer> m_former;
};

// ---- What is counted

class CountingSink final : public IShareCaptureEngineSink {
public:
    int Frames() const { return m_frames; }

    void OnCaptureData(IShareFrame*, TVLRect&) override { ++m_frames; }
    void OnCaptureDisplaySizeChanged(TVLSize) override {}
    void OnCapturedWindowListChanged(const unsigned*, int) override {}
    void OnCaptureStatusChanged(int) override {}
    void OnCaptureError(int) override {}
    void OnCapturePositionChanged(int, int, int, int) override {}
    void OnCaptureEvent(int, int, void*) override {}

private:
    int m_frames = 0;
};

/// A share of the desktop whose passes run on the calling thread: it counts as started and has no worker.
class InlineEngine final : public CShareCaptureDesktopEngine {
public:
    void BelieveStarted() { m_eSHARE_CAPTURE_ENGINE_STATUS = SHARE_CAPTURE_ENGINE_STATUS_STARTED; }
};

class Step {
public:
    virtual ~Step() = default;
    /// What happens on the desktop before; it isn't counted.
    virtual void Prepare() {}
    virtual void Run() = 0;
    /// Whether all of it has been done.
    virtual bool Succeeded() const { return true; }
};

constexpr TVLSize AS_IT_IS{WIDTH, HEIGHT};

/// A pass of an engine that shares a desktop on which a window changes, or none.
class PassStep final : public Step {
public:
    /// `tells` is for a window server that tells moments. `size` is what frames are scaled to.
    explicit PassStep(platform::CGWindowID changing = 0, bool tells = false, TVLSize size = AS_IT_IS)
        : m_served(DesktopScene()),
          m_changing(changing),
          m_engine(new InlineEngine) {
        m_engine->SelectSharedDisplay(DISPLAY);
        m_engine->SetCaptureMaxFrameSize(size.cx, size.cy);
        m_engine->SetSink(&m_sink);
        m_engine->BelieveStarted();
        m_served.Server().TellMoments(tells);
        const bool wide = changing == WIDE_WINDOW;
        for (std::uint32_t seed = 2; seed < 4; ++seed)
            m_contents.push_back(Squares(wide ? WIDTH : 300, wide ? HEIGHT : 20, seed));
    }
    ~PassStep() override { DestroyShareCaptureEngine(m_engine); }
    PassStep(const PassStep&) = delete;
    PassStep& operator=(const PassStep&) = delete;

    void Prepare() override {
        ++m_runs;
        if (m_changing != 0)
            m_served.Server().SetContent(m_changing, m_contents[m_runs % m_contents.size()]);
        m_served.PaintAhead();
    }
    void Run() override { CShareCaptureEngine::ThreadRun(m_engine); }
    bool Succeeded() const override { return m_sink.Frames() == static_cast<int>(m_runs); }

private:
    Served m_served;
    const platform::CGWindowID m_changing;
    std::vector<platform::SimulatedContent> m_contents;
    CountingSink m_sink;
    InlineEngine* const m_engine;
    std::size_t m_runs = 0;
};

/// A walk over windows of which every other is shared.
class WalkStep final : public Step {
public:
    explicit WalkStep(int windows, bool moving) : m_served(SceneOfWindows(windows)), m_moving(moving) {
        m_context.AddSharedDisplay(DISPLAY);
        m_context.AddSharedApp(SHARED_APP);
        m_context.SetShareType(SHARE_TYPE_APP);
    }

    void Prepare() override {
        m_left += 1;
        if (m_moving)
            m_served.Server().MoveWindow(1, {m_left, 100});
    }
    void Run() override { m_context.UpdateShareCapturerContext(); }

private:
    Served m_served;
    const bool m_moving;
    float m_left = 0;
    ShareCapturerContextMac m_context;
};

CShareFrame* NewFrame() {
    auto* const frame = new CShareFrame;
    frame->AddRef();
    return frame;
}

/// The composition of a picture alone, all of which has changed.
class CompositionStep final : public Step {
public:
    CompositionStep() : m_served(DesktopScene()) {
        m_context->AddSharedDisplay(DISPLAY);
        m_context->SetShareType(SHARE_TYPE_DESKTOP);
        m_context->UpdateShareCapturerContext();
        for (std::uint32_t seed = 2; seed < 4; ++seed)
            m_contents.push_back(Squares(WIDTH, HEIGHT, seed));
    }
    ~CompositionStep() override { m_frame->Release(); }
    CompositionStep(const CompositionStep&) = delete;
    CompositionStep& operator=(const CompositionStep&) = delete;

    void Prepare() override {
        m_served.Server().SetContent(WIDE_WINDOW, m_contents[++m_runs % m_contents.size()]);
        m_served.PaintAhead();
    }
    void Run() override {
        constexpr TVLSize SIZE{WIDTH, HEIGHT};
        m_failed = m_capturer.capture(m_frame, DISPLAY, SIZE, SIZE) != 0 || m_failed;
    }
    bool Succeeded() const override { return !m_failed; }

private:
    Served m_served;
    std::vector<platform::SimulatedContent> m_contents;
    std::size_t m_runs = 0;
    bool m_failed = false;
    std::shared_ptr<ShareCapturerContext> m_context = std::make_shared<ShareCapturerContextMac>();
    CShareCGSCapturer m_capturer{m_context};
    CShareFrame* const m_frame = NewFrame();
};

using StepMaker = std::function<std::unique_ptr<Step>()>;

const std::map<std::string, StepMaker>& Steps() {
    static const std::map<std::string, StepMaker> steps{
        {"pass_static", [] { return std::make_unique<PassStep>(); }},
        {"pass_standing", [] { return std::make_unique<PassStep>(0, true); }},
        {"pass_standing_typing", [] { return std::make_unique<PassStep>(SMALL_WINDOW, true); }},
        {"pass_typing", [] { return std::make_unique<PassStep>(SMALL_WINDOW); }},
        {"pass_typing_scaled",
         [] {
             return std::make_unique<PassStep>(SMALL_WINDOW, false, TVLSize{WIDTH * 2 / 3, HEIGHT * 2 / 3});
         }},
        {"pass_full", [] { return std::make_unique<PassStep>(WIDE_WINDOW); }},
        {"composition_full", [] { return std::make_unique<CompositionStep>(); }},
        {"walk_10", [] { return std::make_unique<WalkStep>(10, false); }},
        {"walk_200", [] { return std::make_unique<WalkStep>(200, false); }},
        {"walk_200_moving", [] { return std::make_unique<WalkStep>(200, true); }},
    };
    return steps;
}

} // namespace

/// What callgrind is told to count, by this name.
[[gnu::noinline]] void CountedStep(Step& step) {
    step.Run();
}

namespace {

int RunStep(const StepMaker& make) {
    constexpr int TIMES_BEFORE = 6;
    constexpr int TIMES = 4;
    CCmManualClock clock;
    ICmClock* const former = CmReplaceClock(&clock);
    bool succeeded = false;
    {
        const std::unique_ptr<Step> step = make();
        for (int i = 0; i < TIMES_BEFORE + TIMES; ++i) {
            // What happens once, or once a second, is over when it counts.
            clock.Advance(i < TIMES_BEFORE / 2 ? std::chrono::milliseconds(1500) : TICK);
            step->Prepare();
            if (i < TIMES_BEFORE)
                step->Run();
            else
                CountedStep(*step);
        }
        succeeded = step->Succeeded();
    }
    CmReplaceClock(former);
    if (!succeeded)
        std::fprintf(stderr, "counted_passes: not every step has succeeded\n");
    return succeeded ? EXIT_SUCCESS : EXIT_FAILURE;
}

} // namespace

int main(int argc, char** argv) {
    try {
        if (argc == 2)
            return RunStep(Steps().at(argv[1]));
        for (const auto& step : Steps())
            std::printf("%s\n", step.first.c_str());
        return EXIT_SUCCESS;
    } catch (const std::exception& failure) {
        std::fprintf(stderr, "counted_passes: %s\n", failure.what());
        return EXIT_FAILURE;
    }
}
