// SPDX-License-Identifier: Apache-2.0
#include "src/mac/cgs_composition.h"
#include "tests/src/mac/backend_tools.h"
#include "tests/src/mac/desktop_share_client.h"
#include "tests/src/mac/painted_desk.h"
#include "tests/src/mac/queued_backend_bench.h"
#include "tests/support/test_effort.h"
#include "tests/support/threads.h"

#include <screenshare/share_capturer.h>
#include <screenshare/share_engine.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <chrono>
#include <cstddef>
#include <cstring>
#include <iostream>
#include <memory>
#include <string>
#include <utility>

// Frames that whole shares deliver, beside the same pictures drawn from scratch.

using namespace platform;
using namespace painted_desk;

namespace {

using ms = std::chrono::milliseconds;

struct Judgement {
    int frames = 0;
    int duplicates = 0;
    std::string difference; ///< The first one; empty without any.
};

bool Shows(IShareFrame& frame, const FrameRef& expected) {
    if (expected.Get() == nullptr || SizeOf(frame) != SizeOf(*expected.Get()))
        return false;
    const int bytes = CShareFrame::BackedDataLen(frame);
    return bytes == CShareFrame::BackedDataLen(*expected.Get()) &&
           std::memcmp(frame.GetFrameData(), expected.Get()->GetFrameData(),
                       static_cast<std::size_t>(bytes)) == 0;
}

/// What a frame of that size shows now; empty when there is no picture.
FrameRef DrawFromScratch(const std::shared_ptr<ShareCapturerContext>& context, unsigned display,
                         TVLSize size) {
    CShareCGSCapturer composition(context);
    composition.setMaxSize(size);
    FrameRef frame = NewFrameRef();
    const int result = composition.capture(frame.Get(), display, size, size);
    return result == SHARE_CAPTURE_OK ? frame : FrameRef();
}

/// What an engine goes by.
struct Inside : CShareCaptureEngine {
    static std::shared_ptr<ShareCapturerContext> ContextOf(IShareCaptureEngine& engine) {
        return dynamic_cast<CShareCaptureEngine&>(engine).*&Inside::m_spShareCapturerContext;
    }
    static unsigned DisplayOf(IShareCaptureEngine& engine) {
        auto& inside = dynamic_cast<CShareCaptureEngine&>(engine);
        return (inside.*&Inside::_GetIShareCapturer)()->GetCurrentCaptureDisplayId();
    }
};

/// An engine in the default mode, whose sink compares each frame that was captured just now, and now and then
/// takes it away.
class CEngineOracle {
public:
    CEngineOracle(SHARE_CAPTURE_ENGINE_TYPE type, unsigned seed)
        : m_client(type),
          m_desk(*m_desktop.operator->(), seed),
          m_dice(m_desk.dice) {
        m_client->SelectSharedDisplay(MAIN);
        if (type == SHARE_CAPTURE_ENGINE_TYPE_APP) {
            m_client->AddSharedProcess(static_cast<unsigned>(EDITOR));
            m_client->AddSharedProcess(static_cast<unsigned>(NOTES));
        }
        if (type == SHARE_CAPTURE_ENGINE_TYPE_WINDOW) {
            for (unsigned window = 2; window < 2 + MOST_WINDOWS; ++window)
                m_client->AddSharedWindow(window);
        }
        m_client.sink.SetFrameHook([this](IShareFrame* frame) { Judge(*frame); });
        m_client.Start();
    }

    void Step() {
        for (int i = m_dice.Between(0, 2); i > 0; --i)
            m_desk.Change();
        if (m_dice.OneIn(10))
            ChangeShare();
        m_takesAway = m_dice.OneIn(9);
        // Windows that have moved come to rest on the way.
        for (int i = m_dice.OneIn(3) ? 5 : 1; i > 0; --i) {
            m_picturesBefore = Pictures();
            m_clock->Advance(ms(200));
            Settle(*WorkerOf(*m_client));
        }
    }

    Judgement Result() {
        m_judgement.duplicates = m_client.Statistic().nDuplicateFrames;
        return m_judgement;
    }

private:
    unsigned Pictures() { return m_desktop->CallsOf(SimulatedOperation::TakeWindowPicture); }

    void ChangeShare() {
        const auto window = static_cast<unsigned>(m_desk.AnyWindow());
        switch (m_dice.Between(0, 7)) {
            case 0:
                m_client->AddUnSharedWindow(window);
                return;
            case 1:
            case 2:
                m_client->RemoveUnSharedWindow(window);
                return;
            case 3:
                m_client->SetCaptureMaxFrameSize(m_dice.Between(40, 130), m_dice.Between(40, 90));
                return;
            case 4:
                m_client->SetCaptureMaxFrameSize(1920, 1080);
                return;
            case 5:
                m_settings->m_nAppShareBackgroundColor = m_dice.Between(0, 0xFFFFFF);
                return;
            case 6:
                ChecksDuplicates(m_dice.OneIn(2));
                return;
            default:
                if (m_client->GetCaptureEngineType() == SHARE_CAPTURE_ENGINE_TYPE_WINDOW)
                    m_client->AddSharedWindow(window);
        }
    }
    void ChecksDuplicates(bool checks) {
        EXPECT_EQ(m_client->Config(SHARE_CAPTURE_ENGINE_CONFIG_CHECK_DUP_FRAME, &checks, sizeof(checks)), 0);
    }

    /// On the worker, inside a pass; the test waits meanwhile.
    void Judge(IShareFrame& frame) {
        if (Pictures() == m_picturesBefore)
            return; // sent again, or without windows
        ++m_judgement.frames;
        const FrameRef scratch =
            DrawFromScratch(Inside::ContextOf(*m_client), Inside::DisplayOf(*m_client), SizeOf(frame));
        if (m_judgement.difference.empty() && !Shows(frame, scratch))
            m_judgement.difference = "frame " + std::to_string(m_judgement.frames);
        if (!std::exchange(m_takesAway, false))
            return;
        m_taken.Get()->SwapOrCopy(&frame);
        std::fill_n(m_taken.Get()->GetFrameData(), CShareFrame::BackedDataLen(*m_taken.Get()),
                    static_cast<unsigned char>(0xA5));
    }

    CManualClockScope m_clock;
    CSettingsScope m_settings;
    CServedScene m_desktop{Beginning()};
    FrameRef m_taken = NewFrameRef();
    Judgement m_judgement; // the worker's while a pass lasts
    unsigned m_picturesBefore = 0;
    bool m_takesAway = false;
    CShareClient m_client;
    CPaintedDesk m_desk;
    CDice& m_dice;
};

void ExpectSameFrames(SHARE_CAPTURE_ENGINE_TYPE type) {
    const unsigned SEED = 4711;
    const int steps = TestRounds(1200);
    CEngineOracle oracle(type, SEED);
    for (int i = 0; i < steps; ++i)
        oracle.Step();
    const Judgement result = oracle.Result();
    std::cout << steps << " steps, seed " << SEED << ": " << result.frames << " frames, " << result.duplicates
              << " duplicates\n";
    EXPECT_EQ(result.difference, "");
    EXPECT_GT(result.frames, steps / 5);
    EXPECT_GT(result.duplicates, steps / 20);
}

/// Of the queue comes what was drawn at the tick before.
class QueuedShareOracle : public QueuedBackEnd {
protected:
    QueuedShareOracle() {
        for (ShareRef<CShareFrame>& each : m_frames) {
            each = ShareRef<CShareFrame>(new CShareFrame);
            each.Get()->AllowNote(); // as an engine's
        }
    }

    void Step() {
        for (int i = m_dice.Between(0, 2); i > 0; --i)
            m_desk.Change();
        if (m_dice.OneIn(20))
            context->SetShareType(m_dice.OneIn(2) ? SHARE_TYPE_DESKTOP : SHARE_TYPE_APP);
        if (m_dice.OneIn(20))
            backEnd->setMaxSize(m_dice.OneIn(2) ? TVLSize{1920, 1080}
                                                : TVLSize{m_dice.Between(40, 119), m_dice.Between(40, 79)});
        Advance(501); // what has moved is at rest
        CShareFrame& next = *m_frames[m_next = 1 - m_next].Get();
        const unsigned result = backEnd->captureToIShareFrame(&next);
        ASSERT_TRUE(Settles());
        if (result == OK && m_expected.Get() != nullptr) {
            ++frames;
            EXPECT_TRUE(Shows(next, m_expected)) << "frame " << frames;
        }
        m_expected = DrawFromScratch(context, MAIN, backEnd->getFrameSize());
    }

    int frames = 0;

private:
    CServedScene m_server{Beginning()};
    CPaintedDesk m_desk{*m_server.operator->(), 4711};
    CDice& m_dice = m_desk.dice;
    std::array<ShareRef<CShareFrame>, 2> m_frames;
    FrameRef m_expected;
    std::size_t m_next = 0;
};

} // namespace

TEST_F(QueuedShareOracle, GivesWhatIsDrawnFromScratch) {
    const int steps = TestRounds(1000);
    context->AddSharedDisplay(MAIN);
    for (const pid_t pid : {painted_desk::EDITOR, NOTES})
        context->AddSharedApp(static_cast<unsigned>(pid));
    backEnd->setCaptureDisplay(MAIN);
    for (int i = 0; i < steps && !HasFailure(); ++i)
        Step();
    std::cout << steps << " steps, seed 4711: " << frames << " frames\n";
    EXPECT_GT(frames, steps / 5);
}

TEST(DesktopShareOracle, DeliversOfADesktopWhatIsDrawnFromScratch) {
    ExpectSameFrames(SHARE_CAPTURE_ENGINE_TYPE_DESKTOP);
}

TEST(DesktopShareOracle, DeliversOfApplicationsWhatIsDrawnFromScratch) {
    ExpectSameFrames(SHARE_CAPTURE_ENGINE_TYPE_APP);
}

TEST(DesktopShareOracle, DeliversOfWindowsWhatIsDrawnFromScratch) {
    ExpectSameFrames(SHARE_CAPTURE_ENGINE_TYPE_WINDOW);
}
