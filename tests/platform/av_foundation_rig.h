// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/av_foundation.h"
#include "platform/av_foundation_script.h"
#include "platform/platform_life.h"
#include "platform/simulated/scene.h"
#include "tests/platform/bitmap_tools.h"
#include "tests/support/threads.h"

#include <gtest/gtest.h>

#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <utility>
#include <vector>

/// What tests of capture sessions share: a small desktop, a session on it, and somebody who takes its
/// samples.

/// A sample's pixels, as one that opened it for reading saw them.
struct SampleCopy {
    std::size_t width = 0;
    std::size_t height = 0;
    std::uint32_t format = 0;
    std::vector<std::uint8_t> bytes; // rows without gaps
    platform::CMSampleBufferGenerations generations;
    platform::CGRect displayRect;

    Colour At(std::size_t x, std::size_t y) const {
        const auto layout =
            format == platform::kCVPixelFormatType_32ARGB ? CGPixelLayout::ARGB : CGPixelLayout::RGBA;
        return ReadPixel(layout, bytes.data() + (y * width + x) * 4);
    }
};

inline SampleCopy CopySample(const platform::CMSampleBufferRef& sample) {
    using namespace platform;
    SampleCopy copy;
    copy.generations = CMSampleBufferGetGenerations(sample.get());
    copy.displayRect = CMSampleBufferGetDisplayRect(sample.get());
    const CVPixelBufferRef image = CMSampleBufferGetImageBuffer(sample.get());
    if (CVPixelBufferLockBaseAddress(image.get(), kCVPixelBufferLock_ReadOnly) != kCVReturnSuccess)
        return copy;
    copy.width = CVPixelBufferGetWidth(image.get());
    copy.height = CVPixelBufferGetHeight(image.get());
    copy.format = CVPixelBufferGetPixelFormatType(image.get());
    const std::uint8_t* row = CVPixelBufferGetBaseAddress(image.get());
    for (std::size_t y = 0; y < copy.height; ++y, row += CVPixelBufferGetBytesPerRow(image.get()))
        copy.bytes.insert(copy.bytes.end(), row, row + copy.width * 4);
    EXPECT_EQ(CVPixelBufferUnlockBaseAddress(image.get(), kCVPixelBufferLock_ReadOnly), kCVReturnSuccess);
    return copy;
}

/// Takes samples in. Threads: any.
class CSampleTaker final : public platform::AVCaptureVideoDataOutputSampleBufferDelegate {
public:
    void captureOutput(platform::AVCaptureVideoDataOutput*, const platform::CMSampleBufferRef& sample,
                       platform::AVCaptureConnection*) override {
        if (inside)
            inside(sample);
        {
            const std::lock_guard<std::mutex> lock(m_mutex);
            m_copies.push_back(CopySample(sample));
        }
        came.Add();
    }

    /// The newest one; an empty one while there is none.
    SampleCopy Last() const {
        const std::lock_guard<std::mutex> lock(m_mutex);
        return m_copies.empty() ? SampleCopy() : m_copies.back();
    }

    /// Runs in each call, before anything else. Set it before the session starts.
    std::function<void(const platform::CMSampleBufferRef&)> inside;
    CTally came;

private:
    mutable std::mutex m_mutex;
    std::vector<SampleCopy> m_copies; // guarded by m_mutex
};

/// What a session tells, one letter each: S it has started, X it has stopped, E an error. Threads: any.
class CSessionEar {
public:
    explicit CSessionEar(const std::shared_ptr<platform::AVCaptureSession>& session) {
        using namespace platform;
        for (const AVCaptureNotificationName name :
             {AVCaptureSessionRuntimeErrorNotification, AVCaptureSessionDidStartRunningNotification,
              AVCaptureSessionDidStopRunningNotification}) {
            EXPECT_TRUE(AVCaptureNotificationCenter::defaultCenter()->addObserver(
                this, [this](const AVCaptureNotification& told) { Hear(told); }, name, session));
        }
    }
    ~CSessionEar() { platform::AVCaptureNotificationCenter::defaultCenter()->removeObserver(this); }
    CSessionEar(const CSessionEar&) = delete;
    CSessionEar& operator=(const CSessionEar&) = delete;

    std::string Heard() const {
        const std::lock_guard<std::mutex> lock(m_mutex);
        return m_heard;
    }
    std::string LastError() const {
        const std::lock_guard<std::mutex> lock(m_mutex);
        return m_error;
    }
    /// False when it wasn't told so much after PATIENCE.
    [[nodiscard]] bool Hears(std::size_t count) const { return m_count.Reaches(static_cast<int>(count)); }

    /// Runs in each call, before anything else.
    std::function<void(const platform::AVCaptureNotification&)> inside;

private:
    void Hear(const platform::AVCaptureNotification& told) {
        if (inside)
            inside(told);
        {
            const std::lock_guard<std::mutex> lock(m_mutex);
            m_heard += "ESX"[told.name];
            if (told.name == platform::AVCaptureSessionRuntimeErrorNotification)
                m_error = told.userInfo.AVCaptureSessionErrorKey.localizedDescription;
        }
        m_count.Add();
    }

    mutable std::mutex m_mutex;
    std::string m_heard; // guarded by m_mutex
    std::string m_error; // guarded by m_mutex
    CTally m_count;
};

inline constexpr platform::CGDirectDisplayID RIG_DISPLAY = 1;
inline constexpr platform::CGWindowID RIG_WINDOW = 7;
inline constexpr std::chrono::milliseconds RIG_PERIOD{100};

/// A display of 40 x 30, grey, with a window of 10 x 10 at its top left, red; another display beside it.
inline platform::Scene RigScene() {
    platform::Scene scene;
    scene.Display(0, 0, 40, 30).Background(0x808080).Display(40, 0, 20, 20).App(100, "Editor");
    scene.Window(RIG_WINDOW).At(0, 0, 10, 10).Colour(0xFF0000);
    return scene;
}

constexpr Colour RIG_GREY{0x80, 0x80, 0x80, 255};
constexpr Colour RIG_RED{255, 0, 0, 255};
constexpr Colour RIG_GREEN{0, 255, 0, 255};

/// A session on that desktop, ten frames a second on a clock that stands still until it is moved. It is
/// configured and doesn't run yet.
class CSessionRig : public testing::Test {
protected:
    explicit CSessionRig(const platform::Scene& scene = RigScene())
        : server(scene.Serve()),
          m_serverBefore(platform::ReplaceWindowServer(server)) {
        using namespace platform;
        ReplaceAVCaptureScript(script);
        input = AVCaptureScreenInput::initWithDisplayID(RIG_DISPLAY);
        output = AVCaptureVideoDataOutput::init();
        session = AVCaptureSession::init();
        input->setMinFrameDuration(CMTimeMake(1, 10));
        output->setSampleBufferDelegate(taker, queue);
        output->setVideoSettings(AVVideoSettings{{kCVPixelBufferPixelFormatTypeKey, 32}});
        session->addInput(input);
        session->addOutput(output);
    }
    ~CSessionRig() override {
        if (session != nullptr)
            session->stopRunning();
        session = nullptr;
        platform::Rest();
        platform::ReplaceAVCaptureScript(nullptr);
        platform::ReplaceWindowServer(m_serverBefore);
    }

    void Start() {
        session->startRunning();
        ASSERT_TRUE(session->isRunning());
    }

    /// Starts it and waits for its first sample.
    void StartAndTake() {
        const int before = taker->came.Count();
        Start();
        ASSERT_TRUE(taker->came.Reaches(before + 1));
    }

    /// One frame duration goes by; comes back when the session is looking for a picture.
    void Tick() {
        const unsigned before = Looks();
        clock->Advance(RIG_PERIOD);
        UntilLooks(before + 1);
    }

    /// Comes back when all that is due has been delivered: a tick has been completed when the next one is
    /// under way.
    void Settle() {
        Tick();
        Tick();
        UntilQueueIsEmpty();
    }

    /// Comes back when the session's thread waits for its next tick.
    void UntilItSleeps() const {
        const auto deadline = std::chrono::steady_clock::now() + PATIENCE;
        while (!SampleThreadSleeps() && std::chrono::steady_clock::now() < deadline)
            std::this_thread::yield();
        ASSERT_TRUE(SampleThreadSleeps());
    }

    unsigned Looks() const { return server->CallsOf(platform::SimulatedOperation::TakeNewest); }

    void UntilLooks(unsigned count) const {
        const auto deadline = std::chrono::steady_clock::now() + PATIENCE;
        while (Looks() < count && std::chrono::steady_clock::now() < deadline)
            std::this_thread::yield();
        ASSERT_GE(Looks(), count);
    }

    void UntilQueueIsEmpty() {
        const auto passed = std::make_shared<CTally>();
        platform::dispatch_async(queue, [passed] { passed->Add(); });
        ASSERT_TRUE(passed->Reaches(1));
    }

    void ColourWindow(std::uint32_t rgb) {
        ASSERT_TRUE(server->SetContent(RIG_WINDOW, platform::SimulatedContent::Colour(rgb)));
    }

    /// Has a sample come that is the `count`-th in all.
    void TakeNext(int count) {
        Tick();
        ASSERT_TRUE(taker->came.Reaches(count));
    }

    CManualClockScope clock;
    const std::shared_ptr<platform::SimulatedWindowServer> server;
    const std::shared_ptr<platform::AVCaptureScript> script = std::make_shared<platform::AVCaptureScript>();
    platform::dispatch_queue_t queue =
        platform::dispatch_queue_create("rig", platform::DISPATCH_QUEUE_SERIAL);
    std::shared_ptr<CSampleTaker> taker = std::make_shared<CSampleTaker>();
    std::shared_ptr<platform::AVCaptureScreenInput> input;
    std::shared_ptr<platform::AVCaptureVideoDataOutput> output;
    std::shared_ptr<platform::AVCaptureSession> session;

private:
    static bool SampleThreadSleeps() {
        for (const auto& task : std::filesystem::directory_iterator("/proc/self/task")) {
            std::ifstream file(task.path() / "stat");
            std::string id;
            std::string name;
            std::string state;
            file >> id >> name >> state;
            if (name == "(scn-sample)")
                return state == "S";
        }
        return false;
    }

    const std::shared_ptr<platform::WindowServer> m_serverBefore;
};
