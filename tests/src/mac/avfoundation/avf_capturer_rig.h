// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/av_foundation_script.h"
#include "platform/platform_life.h"
#include "platform/simulated/simulated_window_server.h"
#include "src/mac/avfoundation/share_avf_capturer.h"
#include "tests/src/mac/backend_tools.h"
#include "tests/support/engine_bench.h"
#include "tests/support/threads.h"
#include "tests/support/trace_log.h"
#include "util/cm_text_formator.h"

#include <screenshare/share_capturer.h>

#include <gtest/gtest.h>

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

/// A capture session's owner on a small simulated desktop, on a clock that stands still until it is moved.
/// What becomes of the session is scripted.
class CAVFCapturerRig : public testing::Test {
protected:
    using Operation = platform::AVCaptureOperation;
    using Server = platform::SimulatedOperation;
    using Lines = std::vector<std::string>;

    static constexpr unsigned MAIN = 1;
    static constexpr unsigned SIDE = 2;
    static constexpr platform::CGWindowID WINDOW = 7;
    static constexpr int STEP = 10; // milliseconds
    static constexpr std::uint32_t GREY = 0x808080;
    static constexpr std::uint32_t RED = 0xFF0000;
    static constexpr std::uint32_t GREEN = 0x00FF00;
    static constexpr std::uint32_t BLUE = 0x0000FF;
    static constexpr unsigned OK = SHARE_CAPTURE_OK;
    static constexpr auto FAILED = static_cast<unsigned>(SHARE_CAPTURE_FAILED);
    static constexpr auto NO_DATA = static_cast<unsigned>(SHARE_CAPTURE_NO_DATA);
    static constexpr auto NOTHING_TO_SCALE = static_cast<unsigned>(-311);
    static constexpr const char* FILE_OF_LIFE = "src/mac/avfoundation/share_avf_capturer";
    static constexpr const char* FILE_OF_DISPLAY = "src/mac/avfoundation/share_avf_capturer_display";
    static constexpr const char* FILE_OF_SAMPLES = "src/mac/avfoundation/share_avf_capturer_samples";

    /// A grey display of 40 x 30 with a red window at its top left; a blue one of 20 x 20 beside it.
    static platform::Scene Desk() {
        platform::Scene scene;
        scene.Display(0, 0, 40, 30).Background(GREY).Display(40, 0, 20, 20).Background(BLUE);
        scene.App(5'000'100, "Editor").Window(WINDOW).At(0, 0, 10, 10).Colour(RED);
        return scene;
    }

    explicit CAVFCapturerRig(const platform::Scene& scene = Desk()) : desktop(scene) {
        platform::ReplaceAVCaptureScript(script);
        capturer = std::make_shared<ShareAVFCapturer>();
    }
    ~CAVFCapturerRig() override {
        platform::ReplaceAVCaptureScript(nullptr);
        End();
        platform::Rest();
    }

    /// Ends the session and gives up the share of it.
    void End() {
        if (capturer == nullptr)
            return;
        capturer->stopRun();
        capturer->destroyVideoInputAndOutput();
        capturer = nullptr;
    }

    void Init() { EXPECT_TRUE(capturer->initShareAVFCapturer()); }
    void Start() {
        Init();
        ASSERT_EQ(capturer->startRun(), 0);
        ASSERT_TRUE(capturer->isRunning());
    }
    /// Starts a session that gives no samples of its own.
    void StartSilent() {
        script->Fail(Operation::CanAddOutput);
        Start();
    }
    void StartAndTake() {
        Start();
        ASSERT_TRUE(TakesPicture());
    }

    unsigned Capture() { return capturer->captureToIShareFrame(frame.Get()); }
    /// Waits for a picture.
    [[nodiscard]] bool TakesPicture() {
        return Comes([this] { return Capture() == OK; });
    }
    void Advance(int milliseconds) { clock->Advance(std::chrono::milliseconds(milliseconds)); }
    void Paint(std::uint32_t rgb) {
        ASSERT_TRUE(desktop->SetContent(WINDOW, platform::SimulatedContent::Colour(rgb)));
    }
    unsigned Looks() { return desktop->CallsOf(Server::TakeNewest); }
    /// The session ends by itself.
    void Die() {
        desktop->Lose();
        ASSERT_TRUE(Comes([this] { return !capturer->isRunning(); }));
    }

    /// Asks until it is true, and not once more: what is asked may take something away. Time goes by
    /// meanwhile: a session's thread that is late leaves out the looks that it has missed.
    template <class Condition>
    [[nodiscard]] bool Comes(Condition condition) {
        const auto deadline = std::chrono::steady_clock::now() + PATIENCE;
        while (!condition()) {
            if (std::chrono::steady_clock::now() >= deadline)
                return false;
            Advance(STEP);
            std::this_thread::yield();
        }
        return true;
    }
    /// The test has one share of the capturer, and each sample queue another.
    [[nodiscard]] bool Shares(long count) {
        return Comes([&] { return capturer.use_count() == count; });
    }
    unsigned Calls(Operation operation) const { return script->CallsOf(operation); }

    static std::string Text(const void* address) {
        char buffer[CCmTextFormator::BUFFER_SIZE];
        CCmTextFormator text(buffer, sizeof buffer);
        text << address;
        return std::string(buffer, text.tell());
    }
    std::string Self() const { return Text(capturer.get()); }
    /// The session's address, as the capturer itself tells it. Not beside another log.
    std::string Session() const {
        const CTraceLog trace;
        capturer->didStartRunning({});
        const std::string line = trace.Lines().at(0);
        return line.substr(line.rfind("0x"));
    }

    /// 0xRRGGBB of an alpha-first frame.
    std::uint32_t Rgb(int x, int y) {
        const TVLSize size = SizeOf(*frame.Get());
        if (x >= size.cx || y >= size.cy || frame.Get()->GetFrameDataFormat() != SHARE_FRAME_FORMAT_ARGB)
            return FramePixel::NONE;
        const unsigned char* const at = frame.Get()->GetFrameLineData(y) + static_cast<std::ptrdiff_t>(x) * 4;
        return static_cast<std::uint32_t>(at[1]) << 16 | static_cast<std::uint32_t>(at[2]) << 8 | at[3];
    }

    CManualClockScope clock;
    CSettingsScope settings;
    CServedScene desktop;
    std::shared_ptr<platform::AVCaptureScript> script = std::make_shared<platform::AVCaptureScript>();
    std::shared_ptr<ShareAVFCapturer> capturer;
    FrameRef frame = NewFrameRef();
};
