// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_capturer_desktop_mac.h"

#include "platform/core_graphics.h"
#include "src/mac/share_capturer_context_mac.h"
#include "src/share_source.h"
#include "tests/src/mac/backend_tools.h"
#include "tests/src/mac/no_back_end.h"
#include "tests/support/engine_bench.h"

#include <screenshare/share_engine.h>

#include <gtest/gtest.h>

#include <initializer_list>
#include <string>
#include <utility>
#include <vector>

using namespace platform;

namespace {

using Lines = std::vector<std::string>;

constexpr unsigned MAIN = 1;
constexpr unsigned SIDE = 2;
constexpr std::uint32_t GREEN = 0x00FF00;

Scene Desk() {
    return Scene()
        .Display(0, 0, 200, 120)
        .Display(200, 10, 100, 50)
        .Scale(2)
        .App(5'000'100, "Editor")
        .Window(1)
        .At(50, 40, 80, 40)
        .Colour(GREEN)
        .Pointer(1000, 1000);
}

/// Keeps what a capturer tells.
class CSinkLog final : public IShareCapturerSink {
public:
    int OnShareSourceAdded(IShareSource*) override { return Note("added"); }
    int OnShareSourceRemoved(IShareSource*) override { return Note("removed"); }
    int OnCapturedDisplaySizedChanged(TVLSize size) override {
        return Note("size " + std::to_string(size.cx) + "x" + std::to_string(size.cy));
    }
    int OnCapturedDisplayChanged(bool present) override { return Note(present ? "came" : "went"); }
    int OnCapturedNoSharedApp() override { return Note("no app"); }
    int OnCapturedAppDisplayChanged(unsigned, int, int, int, int) override { return Note("app display"); }
    int OnCapturedWindowChanged(std::vector<unsigned>&) override { return Note("windows"); }
    int OnCapturedAppsCrossMultiMonitors(bool) override { return Note("cross"); }
    int OnCaptureStatusChanged(int) override { return Note("status"); }
    int OnCapturePositionChanged(int, int, int, int) override { return Note("position"); }
    int OnCaptureEvent(int, int, void*) override { return Note("event"); }
    int OnCaptureError(int) override { return Note("error"); }
    int OnCaptureStatistics(SHARE_CAPTURE_STATISTIC&) override { return Note("statistics"); }

    /// What was told since the last call.
    Lines Take() {
        const std::lock_guard<std::mutex> lock(m_mutex);
        return std::exchange(m_told, {});
    }

private:
    int Note(std::string text) {
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_told.push_back(std::move(text));
        return 0;
    }

    std::mutex m_mutex;
    Lines m_told; // guarded by m_mutex
};

class DesktopCapturer : public testing::Test {
protected:
    ~DesktopCapturer() override { capturer.RemoveSink(&sink); }

    static void Changed(CShareCapturerDesktopMac& capturer, unsigned display, unsigned flags) {
        CShareCapturerDesktopMac_DisplayReconfigCallBack(display, flags, &capturer);
    }
    static ShareRef<IShareSource> Source(ShareSourceType type, unsigned long id) {
        ShareSourceInfo info;
        info.sourceId = id;
        info.eType = type;
        ShareRef<IShareSource> source(new CShareSource);
        source.Get()->SetInfo(&info);
        return source;
    }
    std::vector<unsigned> SharedMonitors() const {
        std::vector<unsigned> displays;
        context->GetSharedMonitors(displays);
        return displays;
    }
    void UseSink() { EXPECT_EQ(capturer.AddSink(&sink), 0); }

    CManualClockScope clock;
    CSettingsScope settings;
    CServedScene desktop{Desk()};
    std::shared_ptr<ShareCapturerContext> context = std::make_shared<ShareCapturerContextMac>();
    CShareCapturerDesktopMac capturer{context};
    CSinkLog sink;
    FrameRef frame = NewFrameRef();
};

constexpr unsigned ADDED = kCGDisplayAddFlag;
constexpr unsigned REMOVED = kCGDisplayRemoveFlag;
constexpr unsigned RESHAPED = kCGDisplayDesktopShapeChangedFlag;

} // namespace

// ---- The back-end

TEST_F(DesktopCapturer, IsMadeForADesktopWithItsBackEndOnTheMainDisplay) {
    context->SetShareType(SHARE_TYPE_WINDOW);
    const CTraceLog trace;
    CShareCapturerDesktopMac other(context);
    EXPECT_EQ(context->GetShareType(), SHARE_TYPE_DESKTOP);
    EXPECT_EQ(other.GetCurrentCaptureDisplayId(), MAIN);
    EXPECT_EQ(trace.LinesContaining("InitCapturer"),
              Lines{Info("[CShareCapturerDesktopMac::InitCapturer] create mac capturer "
                         "eScreenCapturerType=1 Success=1")});
    EXPECT_EQ(other.InitCapturer(), 0);
    EXPECT_EQ(trace.CountContaining("InitCapturer"), 1u) << "there is one already";
}

TEST_F(DesktopCapturer, MakesAContextWhenItHasNone) {
    CShareCapturerDesktopMac alone(nullptr);
    EXPECT_EQ(alone.Capture(frame.Get()), 0);
    EXPECT_EQ(alone.AddUnSharedWindow(1), 0);
}

TEST_F(DesktopCapturer, TakesTheDefaultBackEndForEveryTypeThatIsNone) {
    for (const int type : {2, 3, 6, 9, 0, -1}) {
        settings->m_nScreenCapturerType = type;
        const CTraceLog trace;
        CShareCapturerDesktopMac other(context);
        EXPECT_EQ(other.Capture(frame.Get()), 0);
        EXPECT_TRUE(trace.Contains("[ShareCapturerTovel::initBmpContext]")) << type;
    }
}

TEST_F(DesktopCapturer, TakesTheQueuedBackEndInItsMode) {
    settings->m_nScreenCapturerType = 8;
    const CTraceLog trace;
    CShareCapturerDesktopMac other(context);
    EXPECT_EQ(other.Capture(frame.Get()), -304) << "it has nothing at first";
    EXPECT_TRUE(trace.Contains("[ShareCapturerCGSGCD::initBmpContext]"));
    EXPECT_TRUE(trace.Contains("eScreenCapturerType=8 Success=1"));
}

TEST_F(DesktopCapturer, TakesTheBackEndsOfSessionsInTheirModes) {
    for (const auto& [type, word] : {std::pair{7, "[ShareCapturerAVFoundation::initCapturer]"},
                                     std::pair{10, "[ShareAVFCapturer setFPS to ]"}}) {
        settings->m_nScreenCapturerType = type;
        const CTraceLog trace;
        CShareCapturerDesktopMac other(context);
        EXPECT_TRUE(other.Reinit());
        EXPECT_TRUE(trace.Contains(word)) << type;
        EXPECT_TRUE(trace.Contains("eScreenCapturerType=" + std::to_string(type) + " Success=1"));
    }
}

TEST_F(DesktopCapturer, TriesAgainAtEachCaptureWhileTheModeHasNoBackEnd) {
    const CNoBackEndScope noBackEnd;
    for (const int type : {7, 10}) {
        settings->m_nScreenCapturerType = type;
        const CTraceLog trace;
        CShareCapturerDesktopMac other(context);
        EXPECT_EQ(other.Capture(frame.Get()), -1);
        EXPECT_EQ(other.Capture(nullptr), -1);
        EXPECT_EQ(trace.LinesContaining("InitCapturer"),
                  Lines(2, Info("[CShareCapturerDesktopMac::InitCapturer] create mac capturer "
                                "eScreenCapturerType=" +
                                std::to_string(type) + " Success=0")))
            << "a null frame is refused before it looks";
        EXPECT_FALSE(other.Reinit());
        settings->m_nScreenCapturerType = 1;
        EXPECT_EQ(other.Capture(frame.Get()), 0);
    }
}

TEST_F(DesktopCapturer, AnswersWithoutABackEnd) {
    const CNoBackEndScope noBackEnd;
    settings->m_nScreenCapturerType = CNoBackEndScope::MODE;
    CShareCapturerDesktopMac none(context);
    none.AddSink(&sink);
    int x = 1;
    int y = 1;
    int width = 1;
    int height = 1;
    EXPECT_EQ(none.SetCaptureMaxSize({100, 100}), 0);
    EXPECT_EQ(none.GetCurrentCaptureDisplayId(), 0u);
    EXPECT_EQ(none.SelectSharedDisplay(SIDE), -1);
    EXPECT_EQ(none.AddCaptureShareSource(Source(SHARE_SOURCE_TYPE_MONITOR, SIDE).Get()), -1);
    EXPECT_EQ(none.RemoveCaptureShareSource(nullptr), -1);
    EXPECT_FALSE(none.PointerCaptured());
    EXPECT_EQ(none.SetFPS(30), -5);
    EXPECT_EQ(none.SetCaptureThreadCount(1), -1);
    EXPECT_FALSE(none.IsWindowAreaBaseContentSupport());
    EXPECT_EQ(none.GetCurrentCaptureSourcePosition(x, y, width, height), 0);
    EXPECT_EQ(std::vector<int>({x, y, width, height}), std::vector<int>(4));
    Changed(none, MAIN, ADDED | REMOVED | RESHAPED);
    EXPECT_EQ(sink.Take(), Lines{});
    EXPECT_EQ(SharedMonitors(), std::vector<unsigned>{});
    none.RemoveSink(&sink);
}

TEST_F(DesktopCapturer, HandsWhatItIsAskedToItsBackEnd) {
    EXPECT_EQ(capturer.SetCaptureMaxSize({100, 60}), 0);
    EXPECT_EQ(capturer.Capture(frame.Get()), 0);
    EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{100, 60}));
    EXPECT_TRUE(capturer.PointerCaptured());
    EXPECT_EQ(capturer.SetCaptureThreadCount(3), 0) << "whatever the back-end says";
    EXPECT_FALSE(capturer.IsWindowAreaBaseContentSupport());
    int x = 0;
    int y = 0;
    int width = 0;
    int height = 0;
    EXPECT_EQ(capturer.SelectSharedDisplay(SIDE), 0);
    EXPECT_EQ(capturer.GetCurrentCaptureSourcePosition(x, y, width, height), 0);
    EXPECT_EQ(std::vector<int>({x, y, width, height}), std::vector<int>({200, 10, 100, 50}));
}

TEST_F(DesktopCapturer, HasARateOnlyInTheModesOfSessions) {
    EXPECT_EQ(capturer.SetFPS(30), -5);
    settings->m_nScreenCapturerType = 8;
    EXPECT_EQ(capturer.SetFPS(30), -5);
    for (const int type : {7, 10}) {
        settings->m_nScreenCapturerType = type; // the back-end is still the default one
        EXPECT_EQ(capturer.SetFPS(30), 0);
    }
}

// ---- What is shared

TEST_F(DesktopCapturer, SharesOneMonitorAtATime) {
    EXPECT_EQ(capturer.SelectSharedDisplay(SHARE_INVALID_DISPLAY), -2);
    EXPECT_EQ(SharedMonitors(), std::vector<unsigned>{});
    EXPECT_EQ(capturer.SelectSharedDisplay(MAIN), 0);
    EXPECT_EQ(capturer.SelectSharedDisplay(SIDE), 0);
    EXPECT_EQ(SharedMonitors(), std::vector<unsigned>{SIDE});
    EXPECT_EQ(capturer.GetCurrentCaptureDisplayId(), SIDE);
}

TEST_F(DesktopCapturer, SelectsAMonitorEvenIfTheContextRefusesIt) {
    const CTraceLog trace;
    EXPECT_EQ(capturer.SelectSharedMonitor(SHARE_INVALID_DISPLAY), 0);
    const Lines lines = trace.LinesContaining("AddSharedDisplay failed");
    ASSERT_EQ(lines.size(), 1u);
    EXPECT_TRUE(IsLineAt(lines[0],
                         Warning("[CShareCapturerAppMac::SelectSharedMonitor] AddSharedDisplay failed"),
                         "src/mac/share_capturer_desktop_mac"));
}

TEST_F(DesktopCapturer, TakesOnlyMonitorsAsSourcesAndKeepsThem) {
    UseSink();
    const ShareRef<IShareSource> side = Source(SHARE_SOURCE_TYPE_MONITOR, (1ul << 32) + SIDE);
    EXPECT_EQ(capturer.AddCaptureShareSource(nullptr), -1);
    EXPECT_EQ(capturer.AddCaptureShareSource(Source(SHARE_SOURCE_TYPE_APP, SIDE).Get()), -1);
    EXPECT_EQ(capturer.AddCaptureShareSource(Source(static_cast<ShareSourceType>(3), SIDE).Get()), -1);
    EXPECT_EQ(SharedMonitors(), std::vector<unsigned>{});
    EXPECT_EQ(capturer.AddCaptureShareSource(side.Get()), 0);
    EXPECT_EQ(SharedMonitors(), std::vector<unsigned>{SIDE}) << "ids are cut to 32 bits";
    EXPECT_EQ(capturer.AddCaptureShareSource(side.Get()), -1) << "it is there";
    EXPECT_EQ(capturer.RemoveCaptureShareSource(side.Get()), 0);
    EXPECT_EQ(capturer.GetCaptureShareSourceCount(), 1);
    EXPECT_EQ(sink.Take(), Lines{"added"});
}

TEST_F(DesktopCapturer, StandsOnWhatTheContextSaysAfterAReinit) {
    EXPECT_TRUE(capturer.Reinit());
    EXPECT_EQ(capturer.GetCurrentCaptureDisplayId(), MAIN) << "nothing is shared yet";
    context->AddSharedDisplay(SIDE);
    context->AddSharedDisplay(MAIN);
    EXPECT_TRUE(capturer.Reinit());
    EXPECT_EQ(capturer.GetCurrentCaptureDisplayId(), SIDE);
    EXPECT_EQ(SharedMonitors(), (std::vector<unsigned>{SIDE, MAIN}));
}

// ---- Displays that change

TEST_F(DesktopCapturer, TellsOfEveryDisplayThatComesAndOnlyOfItsOwnThatGoes) {
    UseSink();
    Changed(capturer, SIDE, ADDED);
    EXPECT_EQ(sink.Take(), Lines{"came"});
    Changed(capturer, SIDE, REMOVED);
    EXPECT_EQ(sink.Take(), Lines{});
    Changed(capturer, MAIN, REMOVED);
    EXPECT_EQ(sink.Take(), Lines{"went"});
}

TEST_F(DesktopCapturer, TellsTheSizeOfItsOwnDisplayInPixels) {
    UseSink();
    Changed(capturer, SIDE, RESHAPED);
    EXPECT_EQ(sink.Take(), Lines{});
    capturer.SelectSharedDisplay(SIDE);
    Changed(capturer, SIDE, RESHAPED);
    EXPECT_EQ(sink.Take(), Lines{"size 200x100"});
}

TEST_F(DesktopCapturer, RunsABranchForEachFlagPlugInFirst) {
    UseSink();
    const CTraceLog trace;
    Changed(capturer, MAIN, RESHAPED | REMOVED | ADDED);
    EXPECT_EQ(sink.Take(), (Lines{"came", "went", "size 200x120"}));
    EXPECT_EQ(trace.Lines().front(),
              Info("[ShareCapturerTovel_DisplayReconfigCallBack] flag=4144 displayid=1"));
}

TEST_F(DesktopCapturer, WorksItsTablesOutAnewWhenADisplayMoves) {
    capturer.SelectSharedDisplay(SIDE);
    for (const unsigned flag : {kCGDisplayMovedFlag, kCGDisplaySetMainFlag}) {
        const auto left = static_cast<int>(flag * 100);
        const CServedScene moved(
            Scene().Display(0, 0, 200, 120).Display(static_cast<float>(left), 0, 100, 50));
        Changed(capturer, SIDE, flag);
        std::map<unsigned, TVLRect> rects;
        context->GetDisplayRects(rects);
        EXPECT_EQ(rects[SIDE].left, left);
    }
}

TEST_F(DesktopCapturer, HearsNothingThatBelongsToNobody) {
    const CTraceLog trace;
    CShareCapturerDesktopMac_DisplayReconfigCallBack(MAIN, ADDED, nullptr);
    EXPECT_EQ(trace.Lines(), Lines{});
}

TEST_F(DesktopCapturer, HearsOfRealChangesFromItsBeginningToItsEnd) {
    CTally heard;
    const auto hear = [](unsigned, unsigned flags, void* tally) {
        if ((flags & kCGDisplayRemoveFlag) != 0)
            static_cast<CTally*>(tally)->Add();
    };
    UseSink();
    ASSERT_EQ(CGDisplayRegisterReconfigurationCallback(hear, &heard), 0);
    {
        CShareCapturerDesktopMac shortLived(context);
        shortLived.AddSink(&sink);
    }
    capturer.SelectSharedDisplay(SIDE);
    desktop->RemoveDisplay(SIDE);
    EXPECT_TRUE(heard.Reaches(1));
    EXPECT_EQ(CGDisplayRemoveReconfigurationCallback(hear, &heard), 0);
    const Lines told = sink.Take();
    EXPECT_EQ(std::count(told.begin(), told.end(), "went"), 1) << "only the one that lives";
}

// ---- Its maker

TEST_F(DesktopCapturer, IsWhatTheExportedFunctionMakesForADesktop) {
    IShareCapturer* const made = CreateShareCapture(SHARE_CAPTURER_TYPE_DESKTOP, context);
    EXPECT_NE(dynamic_cast<CShareCapturerDesktopMac*>(made), nullptr);
    EXPECT_EQ(DestroyShareCapture(made), 0);
}
