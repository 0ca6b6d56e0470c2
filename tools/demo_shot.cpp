// SPDX-License-Identifier: Apache-2.0
#include "tools/demo_shot.h"

#include "platform/window_server.h"
#include "src/share_image_save.h"
#include "tools/capture_engine.h"
#include "tools/capture_sink.h"

#include <screenshare/share_engine.h>

#include <poll.h>

#include <algorithm>
#include <array>
#include <chrono>

namespace {

using ShotClock = std::chrono::steady_clock;

constexpr std::chrono::seconds BEGIN_PATIENCE{5};
constexpr std::chrono::seconds SETTLE_PATIENCE{2};
constexpr std::chrono::milliseconds SHOT_LOOK{100};

/// What has begun may still show something older: so many frames over so long are enough.
constexpr std::int64_t SETTLED_FRAMES = 5;
constexpr std::chrono::seconds SETTLED_AFTER{1};

constexpr unsigned FELL_BACK_FLAG = 2; // of the statistics

/// Keeps the last frame. Threads: the engine's while it captures, any after the sink is closed.
class LastFrame : public FrameWriter {
public:
    LastFrame(StopFlag& begun, StopFlag& settled) : m_begun(begun), m_settled(settled) {}

    WriteResult Write(IShareFrame& frame) override {
        m_image = ShareFrameToImage(&frame);
        m_last = ShotClock::now();
        ++m_frames;
        if (m_frames == 1) {
            m_first = m_last;
            m_begun.Raise();
        }
        if (m_frames >= SETTLED_FRAMES && m_last - m_first >= SETTLED_AFTER)
            m_settled.Raise();
        return std::nullopt;
    }
    WriteResult Finish(unsigned) override { return std::nullopt; }

    const platform::CGImageRef& Image() const { return m_image; }
    double FramesPerSecond() const {
        const double seconds = std::chrono::duration<double>(m_last - m_first).count();
        return seconds > 0 ? static_cast<double>(m_frames - 1) / seconds : 0;
    }

private:
    StopFlag& m_begun;
    StopFlag& m_settled;
    platform::CGImageRef m_image;
    ShotClock::time_point m_first;
    ShotClock::time_point m_last;
};

bool IsDesktopLost() {
    return platform::CurrentWindowServer()->GetLife().life == platform::Life::Lost;
}

/// Whether the notice comes in time. Gives up when the demo is to stop, or the desktop has gone.
bool Comes(const StopNotice& notice, const StopNotice& stop, std::chrono::seconds patience) {
    const ShotClock::time_point end = ShotClock::now() + patience;
    while (!notice.IsRaised()) {
        const auto left = std::chrono::ceil<std::chrono::milliseconds>(end - ShotClock::now());
        if (left.count() <= 0 || stop.IsRaised() || IsDesktopLost())
            return false;
        std::array<pollfd, 2> descriptors{{{stop.Descriptor(), POLLIN, 0}, {notice.Descriptor(), POLLIN, 0}}};
        poll(descriptors.data(), descriptors.size(), static_cast<int>(std::min(left, SHOT_LOOK).count()));
    }
    return true;
}

/// Each pass counts here, also where nothing has changed since the one before.
void DeliverDuplicates(IShareCaptureEngine& engine) {
    bool holdsDuplicates = false;
    engine.Config(SHARE_CAPTURE_ENGINE_CONFIG_CHECK_DUP_FRAME, &holdsDuplicates, sizeof holdsDuplicates);
}

std::string RemarkOn(const DemoShot& shot, IShareCaptureEngine& engine) {
    if (shot.picture == nullptr)
        return "no picture within 5 seconds";
    SHARE_CAPTURE_STATISTIC statistic{};
    engine.GetShareCaptureStatistic(statistic);
    return (statistic.nFlags & FELL_BACK_FLAG) != 0 ? "made as by default: this way has failed" : "";
}

} // namespace

DemoShot TakeShot(const ShareRequest& request, SCREEN_CAPTURER_TYPE mode, const StopNotice& stop) {
    DemoShot shot;
    shot.mode = mode;
    CaptureOptions options;
    options.request = request;
    options.mode = mode;
    StopFlag begun;
    StopFlag settled;
    StopFlag ended;
    LastFrame frames(begun, settled);
    CaptureSink sink(frames, 0, ended);
    const EngineHandle engine(CreateShareCaptureEngine(EngineTypeOf(request)));
    if (engine == nullptr) {
        shot.remark = "no picture: there is no engine for that";
        return shot;
    }
    EngineAnswer answer = SetUpEngine(*engine, options, sink);
    DeliverDuplicates(*engine);
    if (answer.code == EXIT_CODE_DONE)
        answer = StartEngine(*engine);
    if (answer.code != EXIT_CODE_DONE) {
        shot.remark = "no picture: " + answer.problem;
        return shot;
    }
    if (Comes(begun, stop, BEGIN_PATIENCE))
        Comes(settled, stop, SETTLE_PATIENCE);
    sink.Close();
    shot.picture = frames.Image();
    shot.framesPerSecond = frames.FramesPerSecond();
    shot.remark = RemarkOn(shot, *engine);
    return shot;
}
