// SPDX-License-Identifier: Apache-2.0
#include "src/mac/cgs_composition.h"
#include "src/mac/share_capturer_context_mac.h"
#include "tests/src/mac/backend_tools.h"
#include "tests/src/mac/painted_desk.h"
#include "tests/support/test_effort.h"
#include "tests/support/threads.h"

#include <screenshare/share_capturer.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstring>
#include <iostream>
#include <memory>
#include <string>
#include <vector>

// Pictures drawn into frames that are used again and again, beside the same pictures drawn from scratch.

using namespace platform;
using namespace painted_desk;

namespace {

constexpr std::size_t PIXEL = 4;
constexpr std::size_t MARK = 3; // the byte of a pixel that means nothing, and that all painting sets to 255

struct Outcome {
    int passes = 0;
    int idle = 0; ///< Nothing was drawn.
    int parts = 0;
    int wholes = 0;
    int sameNotes = 0; ///< Two frames were known to be equal.
    int failures = 0;
    std::string difference; ///< The first one; empty without any.
};

std::ostream& operator<<(std::ostream& out, const Outcome& outcome) {
    return out << outcome.passes << " passes: " << outcome.idle << " idle, " << outcome.parts << " in parts, "
               << outcome.wholes << " whole, " << outcome.failures << " failed; " << outcome.sameNotes
               << " known to be equal";
}

std::size_t BytesOf(CShareFrame& frame) {
    return static_cast<std::size_t>(CShareFrame::BackedDataLen(frame));
}

class COracle {
public:
    COracle(SimulatedWindowServer& desktop, unsigned seed) : m_desk(desktop, seed), m_dice(m_desk.dice) {
        for (ShareRef<CShareFrame>& frame : m_frames) {
            frame = ShareRef<CShareFrame>(new CShareFrame);
            frame.Get()->AllowNote();
        }
        m_foreign = ShareRef<CShareFrame>(new CShareFrame);
        m_context->AddSharedDisplay(MAIN);
        for (const pid_t pid : {EDITOR, NOTES})
            m_context->AddSharedApp(static_cast<unsigned>(pid));
    }

    void Step(Outcome& outcome) {
        for (int i = m_dice.Between(0, 3); i > 0; --i)
            m_desk.Change();
        if (m_dice.OneIn(6))
            ChangeShare();
        if (m_dice.OneIn(12))
            ChangeSettings();
        if (m_dice.OneIn(10))
            ChangeFrame();
        m_next = m_dice.OneIn(8) ? AnyFrame() : (m_next + 1) % 2;
        CaptureInto(*m_frames[m_next].Get(), outcome);
        Compare(outcome);
    }

private:
    std::size_t AnyFrame() { return static_cast<std::size_t>(m_dice.Between(0, FRAMES - 1)); }

    void ChangeShare() {
        const auto window = static_cast<unsigned>(m_desk.AnyWindow());
        switch (m_dice.Between(0, 9)) {
            case 0:
                m_context->SetShareType(m_dice.OneIn(3) ? SHARE_TYPE_DESKTOP
                                                        : static_cast<SHARE_TYPE>(m_dice.Between(1, 3)));
                return;
            case 1:
                m_context->AddUnSharedWindow(window);
                return;
            case 2:
                m_context->RemoveUnSharedWindow(window);
                return;
            case 3:
                m_context->AddSharedWindow(window);
                return;
            case 4:
                m_context->RemoveSharedWindow(window);
                return;
            case 5:
                m_context->RemoveSharedApp(static_cast<unsigned>(m_dice.OneIn(2) ? EDITOR : NOTES));
                m_context->AddSharedApp(static_cast<unsigned>(m_dice.OneIn(2) ? EDITOR : NOTES));
                return;
            case 6:
                m_context->m_bNoWindowBaseArea = m_dice.OneIn(2);
                return;
            default:
                for (const unsigned each : Listed(&ShareCapturerContext::GetUnSharedWindows))
                    m_context->RemoveUnSharedWindow(each);
        }
    }
    std::vector<unsigned> Listed(int (ShareCapturerContext::*list)(std::vector<unsigned>&) const) {
        std::vector<unsigned> windows;
        (*m_context.*list)(windows);
        return windows;
    }
    void ChangeSettings() {
        switch (m_dice.Between(0, 4)) {
            case 0:
                m_settings->m_nAppShareBackgroundColor = m_dice.Between(0, 0xFFFFFF);
                return;
            case 1:
                m_max = m_dice.OneIn(3) ? TVLSize{m_dice.Between(40, 119), m_dice.Between(40, 79)}
                                        : TVLSize{1920, 1080};
                return;
            case 2:
                m_settings->m_nShareConfigFlags = m_dice.OneIn(3) ? int{SHARE_CONFIG_FLAG_NO_POINTER} : 0;
                return;
            case 3:
                m_display = m_dice.OneIn(3) ? SIDE : MAIN;
                m_context->ClearSharedDisplay();
                m_context->AddSharedDisplay(m_display);
                return;
            default:
                m_settings->m_bCaptureResampleFixSizeEnable = m_dice.OneIn(20);
                m_settings->m_nResampleScreenCaptureWidth = 800;
                m_settings->m_nResampleScreenCaptureHeight = 600;
        }
    }
    /// What a client, the engine and other capturers do to frames.
    void ChangeFrame() {
        CShareFrame& frame = *m_frames[AnyFrame()].Get();
        TVLSize size{};
        frame.GetFrameSize(size);
        std::vector<unsigned char> bytes(BytesOf(frame) + PIXEL, 0x5A);
        TVLRect rect{0, 0, size.cx, size.cy / 2};
        switch (m_dice.Between(0, 6)) {
            case 0:
                frame.WriteFrameAreaData(rect, bytes.data(), static_cast<int>(bytes.size()));
                return;
            case 1:
                frame.WriteFrameData(bytes.data(), m_dice.Between(0, static_cast<int>(BytesOf(frame))));
                return;
            case 2:
                frame.SetFrameSize(m_dice.Between(0, 130), m_dice.Between(0, 90));
                return;
            case 3:
                frame.SetFrameDataFormat(m_dice.OneIn(2) ? SHARE_FRAME_FORMAT_ARGB : SHARE_FRAME_FORMAT_RGB);
                return;
            case 4:
                frame.SwapOrCopy(m_frames[AnyFrame()].Get());
                return;
            case 5:
                // A client takes the picture away and has its own memory, and paints on that.
                std::fill_n(m_foreign.Get()->GetFrameData(), BytesOf(*m_foreign.Get()),
                            static_cast<unsigned char>(0xA5));
                m_foreign.Get()->SwapOrCopy(&frame);
                return;
            default:
                // As for each queued capture; both, as they know where the last picture was.
                m_capturer = std::make_unique<CShareCGSCapturer>(m_context);
                m_fresh = std::make_unique<CShareCGSCapturer>(m_context);
        }
    }

    void CaptureInto(CShareFrame& frame, Outcome& outcome) {
        CGRect rect;
        TVLSize bitmap{};
        TVLSize capture{};
        CShareCGSCapturer::calcScreenSize(m_display, m_max, rect, bitmap, capture);
        if (rect.size.width > 0)
            m_settings->SetCurrentScale(static_cast<float>(bitmap.cx) / rect.size.width);
        m_context->UpdateShareCapturerContext();
        // Whatever is painted gets another mark; nobody is told of these.
        for (std::size_t at = MARK; frame.HasNote() && at < BytesOf(frame); at += PIXEL)
            frame.GetFrameData()[at] = 7;
        const bool hadNote = frame.HasNote();
        m_scratch = NewFrameRef();
        CShareCGSCapturer& fresh = *m_fresh;
        m_capturer->setMaxSize(m_max);
        fresh.setMaxSize(m_max);
        const int result = m_capturer->capture(&frame, m_display, bitmap, capture);
        const int expected = fresh.capture(m_scratch.Get(), m_display, bitmap, capture);
        ++outcome.passes;
        if (result != expected || m_capturer->PointerCaptured() != fresh.PointerCaptured())
            Report(outcome, "other results");
        m_isShown = result == SHARE_CAPTURE_OK;
        const std::size_t drawn = RemoveMarks(frame);
        const bool isAll = !hadNote || drawn == BytesOf(frame) / PIXEL;
        if (m_isShown)
            ++(isAll ? outcome.wholes : drawn == 0 ? outcome.idle : outcome.parts);
        else
            ++outcome.failures;
    }
    /// How many pixels have been painted.
    static std::size_t RemoveMarks(CShareFrame& frame) {
        std::size_t drawn = 0;
        for (std::size_t at = MARK; at < BytesOf(frame); at += PIXEL) {
            drawn += frame.GetFrameData()[at] == 7 ? 0U : 1U;
            frame.GetFrameData()[at] = 255;
        }
        return drawn;
    }

    void Compare(Outcome& outcome) {
        CShareFrame& frame = *m_frames[m_next].Get();
        if (m_isShown) {
            auto& scratch = dynamic_cast<CShareFrame&>(*m_scratch.Get());
            if (SizeOf(frame) != SizeOf(scratch) ||
                frame.GetFrameDataFormat() != scratch.GetFrameDataFormat() ||
                frame.GetMetaInfo().rectCapture != scratch.GetMetaInfo().rectCapture ||
                frame.GetMetaInfo().bPointerCaptured != scratch.GetMetaInfo().bPointerCaptured)
                Report(outcome, "another size, format or meta information");
            if (!HaveSamePixels(frame, scratch))
                Report(outcome, "other pixels");
        }
        CShareFrame& other = *m_frames[1 - m_next % 2].Get();
        if (&other == &frame || !AreKnownToBeEqual(frame, other))
            return;
        ++outcome.sameNotes;
        if (!HaveSamePixels(frame, other))
            Report(outcome, "frames that are said to be equal and aren't");
    }
    /// Without a look at their pixels.
    static bool AreKnownToBeEqual(CShareFrame& one, CShareFrame& other) {
        if (!one.HasNote() || !other.HasNote() || BytesOf(one) == 0 || BytesOf(other) == 0)
            return false;
        const unsigned char former = *other.GetFrameData();
        *other.GetFrameData() = static_cast<unsigned char>(*one.GetFrameData() + 1);
        const bool areEqual = one.HasSameData(other);
        *other.GetFrameData() = former;
        return areEqual;
    }
    static bool HaveSamePixels(CShareFrame& one, CShareFrame& other) {
        const std::size_t bytes = BytesOf(one);
        return bytes == BytesOf(other) && one.GetFrameDataLen() == other.GetFrameDataLen() &&
               (bytes == 0 || std::memcmp(one.GetFrameData(), other.GetFrameData(), bytes) == 0);
    }
    static void Report(Outcome& outcome, const std::string& what) {
        if (outcome.difference.empty())
            outcome.difference = what + " in pass " + std::to_string(outcome.passes);
    }

    static constexpr int FRAMES = 3;

    CSettingsScope m_settings;
    CPaintedDesk m_desk;
    CDice& m_dice;
    std::shared_ptr<ShareCapturerContext> m_context = std::make_shared<ShareCapturerContextMac>();
    std::unique_ptr<CShareCGSCapturer> m_capturer = std::make_unique<CShareCGSCapturer>(m_context);
    std::unique_ptr<CShareCGSCapturer> m_fresh = std::make_unique<CShareCGSCapturer>(m_context);
    std::array<ShareRef<CShareFrame>, FRAMES> m_frames;
    ShareRef<CShareFrame> m_foreign;
    FrameRef m_scratch = NewFrameRef();
    std::size_t m_next = 0;
    TVLSize m_max{1920, 1080};
    unsigned m_display = MAIN;
    bool m_isShown = false;
};

Outcome Watch(unsigned seed, int steps, const SimulatedLie* lie = nullptr) {
    const CServedScene desktop(Beginning());
    if (lie != nullptr)
        desktop->Lie(*lie);
    COracle oracle(*desktop.operator->(), seed);
    Outcome outcome;
    for (int i = 0; i < steps && outcome.difference.empty(); ++i)
        oracle.Step(outcome);
    return outcome;
}

} // namespace

TEST(CompositionOracle, ShowsInFramesThatAreUsedAgainWhatItShowsInNewOnes) {
    const int rounds = TestRounds(16);
    constexpr int STEPS = 400;
    Outcome all;
    for (int round = 0; round < rounds; ++round) {
        const auto seed = static_cast<unsigned>(4711 + round);
        const Outcome outcome = Watch(seed, STEPS);
        EXPECT_EQ(outcome.difference, "") << "seed " << seed;
        all.passes += outcome.passes;
        all.idle += outcome.idle;
        all.parts += outcome.parts;
        all.wholes += outcome.wholes;
        all.sameNotes += outcome.sameNotes;
        all.failures += outcome.failures;
    }
    std::cout << "seeds from 4711, " << all << "\n";
    EXPECT_GT(all.idle, all.passes / 20) << "nothing is spared";
    EXPECT_GT(all.parts, all.passes / 20) << "nothing is drawn in parts";
    EXPECT_GT(all.sameNotes, all.passes / 50);
    EXPECT_LT(all.failures, all.passes / 4);
}

TEST(CompositionOracle, SeesAPartOfAChangeThatIsNotTold) {
    const SimulatedLie lie = SimulatedLie::ChangesForgotten;
    EXPECT_NE(Watch(4711, 400, &lie).difference, "");
}
