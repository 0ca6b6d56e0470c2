// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/mac/share_capturer_context_mac.h"
#include "src/mac/share_capturer_desktop_mac.h"
#include "src/share_util.h"
#include "tests/src/mac/backend_tools.h"
#include "tests/src/mac/no_back_end.h"
#include "tests/support/capturer_probe.h"
#include "tests/support/engine_bench.h"
#include "tests/support/threads.h"

#include <screenshare/share_engine.h>

#include <gtest/gtest.h>

#include <chrono>
#include <memory>
#include <string>
#include <vector>

/// A capturer that follows windows over two displays, on a clock that stands still: an editor on the main one
/// and a painter on the other.
template <class Capturer>
class FollowingCapturer : public testing::Test {
protected:
    using Lines = std::vector<std::string>;
    using Displays = std::vector<unsigned>;

    static constexpr unsigned MAIN = 1;
    static constexpr unsigned SIDE = 2;
    static constexpr unsigned EDITOR = 5'000'100;
    static constexpr unsigned PAINTER = 5'000'200;
    static constexpr unsigned EDITOR_WINDOW = 1;
    static constexpr unsigned PAINTER_WINDOW = 2;
    static constexpr std::uint32_t GREEN = 0x00FF00;
    static constexpr std::uint32_t BLUE = 0x0000FF;
    static constexpr TVLSize MAIN_SIZE{200, 120};
    static constexpr TVLSize SIDE_SIZE{100, 50};
    static constexpr const char* ON_MAIN = "app display 1,0,0,200,120";
    static constexpr const char* ON_SIDE = "app display 2,200,10,100,50";
    static constexpr auto SOURCE_OF_A_WINDOW = static_cast<ShareSourceType>(3);

    /// One whose inside the tests reach.
    class Probe : public Capturer {
    public:
        using Capturer::Capturer;
        void LoseContext() { this->m_shareCapturerContext.reset(); }
    };

    ~FollowingCapturer() override { capturer.RemoveSink(&sink); }

    static platform::Scene Desk() {
        return platform::Scene()
            .Display(0, 0, 200, 120)
            .Display(200, 10, 100, 50)
            .App(static_cast<pid_t>(PAINTER), "Painter")
            .Window(PAINTER_WINDOW)
            .At(210, 20, 40, 20)
            .Colour(BLUE)
            .App(static_cast<pid_t>(EDITOR), "Editor")
            .Window(EDITOR_WINDOW)
            .At(20, 30, 60, 40)
            .Colour(GREEN)
            .Pointer(1000, 1000);
    }
    static ShareRef<IShareSource> Source(ShareSourceType type, unsigned long id) {
        ShareSourceInfo info;
        info.sourceId = id;
        info.eType = type;
        ShareRef<IShareSource> source(new CShareSource);
        source.Get()->SetInfo(&info);
        return source;
    }

    void SetUp() override { ASSERT_EQ(capturer.AddSink(&sink), 0); }

    int Pass() { return capturer.Capture(frame.Get()); }
    int PassAfter(std::chrono::milliseconds time) {
        clock->Advance(time);
        return Pass();
    }
    /// Until what has moved is seen, is at rest and is followed.
    void PassUntilRest() {
        for (int i = 0; i < 4; ++i)
            PassAfter(std::chrono::milliseconds(600));
    }
    Displays SharedMonitors() const {
        Displays displays;
        context->GetSharedMonitors(displays);
        return displays;
    }
    /// What the sink was told since the last call.
    Lines TakeTold() {
        const Lines told = calls.Calls();
        calls.Clear();
        return told;
    }
    static std::string CreationLine(int type, bool isMade) {
        return Info("[CShareCapturerDesktopMac::InitCapturer] create mac capturer eScreenCapturerType=" +
                    std::to_string(type) + " Success=" + (isMade ? "1" : "0"));
    }
    /// Without what back-ends trace of themselves.
    static Lines LinesOfCapturers(const CTraceLog& trace) { return trace.LinesContaining("[CShareCapturer"); }

    CManualClockScope clock;
    CSettingsScope settings;
    CServedScene desktop{Desk()};
    std::shared_ptr<ShareCapturerContext> context = std::make_shared<ShareCapturerContextMac>();
    CCallLog calls;
    CCapturerSink sink{calls};
    Probe capturer{context};
    FrameRef frame = NewFrameRef();
};
