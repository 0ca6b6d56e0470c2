// SPDX-License-Identifier: Apache-2.0
#include "tests/security/client_courses.h"
#include "tests/security/engine_operations.h"
#include "tests/security/fault_bench.h"

#include <gtest/gtest.h>

#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <utility>

// What a client may do inside a callback: anything, but for ending the engine whose callback it is.

namespace {

/// What a test does inside the callbacks of one name, while it is armed. A callback that never comes back
/// ends the process, since nothing else gets a deadlocked thread out of the way.
class CInside {
public:
    explicit CInside(std::string callback) : m_callback(std::move(callback)) {}

    void Arm(std::function<void()> work) {
        m_work = std::move(work);
        m_isArmed = true;
    }

    /// By the callback. Works once at each arming, and not inside of itself.
    void Enter(const char* callback) {
        const CPlentyScope plenty;
        if (m_callback != callback || !m_isArmed.exchange(false))
            return;
        m_work();
        m_left.Add();
    }

    void AwaitReturn() const {
        if (m_left.Reaches(1))
            return;
        std::fprintf(stderr, "%s wasn't called, or never came back\n", m_callback.c_str());
        std::abort();
    }

private:
    const std::string m_callback;
    std::function<void()> m_work; // before m_isArmed
    std::atomic<bool> m_isArmed{false};
    CTally m_left;
};

class CInsideSink final : public IShareCaptureEngineSink {
public:
    explicit CInsideSink(CInside& inside) : m_inside(inside) {}

    void OnCaptureDisplaySizeChanged(TVLSize) override { Hear("OnCaptureDisplaySizeChanged"); }
    void OnCapturedWindowListChanged(const unsigned*, int) override { Hear("OnCapturedWindowListChanged"); }
    void OnCaptureStatusChanged(int) override { Hear("OnCaptureStatusChanged"); }
    void OnCaptureData(IShareFrame*, TVLRect&) override { Hear("OnCaptureData"); }
    void OnCaptureError(int) override { Hear("OnCaptureError"); }
    void OnCapturePositionChanged(int, int, int, int) override { Hear("OnCapturePositionChanged"); }
    void OnCaptureEvent(int, int, void*) override { Hear("OnCaptureEvent"); }

    /// From now on a call is a failure.
    void Leave() { m_hasLeft = true; }
    bool WasCalledAfterwards() const { return m_isCalledAfterwards; }

private:
    void Hear(const char* callback) {
        if (m_hasLeft)
            m_isCalledAfterwards = true;
        m_inside.Enter(callback);
    }

    CInside& m_inside;
    std::atomic<bool> m_hasLeft{false};
    std::atomic<bool> m_isCalledAfterwards{false};
};

/// A callback of an engine's sink, and how it comes about.
struct SinkCase {
    const char* callback;
    FaultKind kind;
    void (*cause)(FaultBench& bench);
};

void PrintTo(const SinkCase& one, std::ostream* out) {
    *out << one.callback;
}

class InsideSink : public testing::TestWithParam<SinkCase> {
protected:
    ~InsideSink() override { EXPECT_EQ(bench.client->SetSink(nullptr), 0); }

    void Run() {
        EXPECT_EQ(bench.client->SetSink(&sink), 0);
        bench.Start();
        GetParam().cause(bench);
        inside.AwaitReturn();
        bench.SettleWorker();
    }
    /// Frames come again, to a sink that does nothing.
    void ExpectToGoOn() {
        PutDeskInOrder();
        bench.AwaitNotices();
        bench.SetSink();
        bench.TellModeAnew();
        bench.ShareText();
        bench.Start();
        EXPECT_TRUE(bench.ShowsText());
        EXPECT_EQ(bench.client->GetCaptureStatus(), SHARE_CAPTURE_ENGINE_STATUS_STARTED);
    }
    /// A display may have gone, with the places of all that is there, and the text have come to the front.
    void PutDeskInOrder() {
        const platform::SimulatedDesktop whole = FaultBench::Desk().Build();
        bench.desktop->Change([&](platform::SimulatedDesktop& desktop) {
            desktop.displays = whole.displays;
            desktop.windows = whole.windows;
        });
    }

    FaultBench bench{GetParam().kind};
    CInside inside{GetParam().callback};
    CInsideSink sink{inside};
};

constexpr FaultKind APP{SHARE_CAPTURE_ENGINE_TYPE_APP};
constexpr FaultKind SESSION{SHARE_CAPTURE_ENGINE_TYPE_DESKTOP, SCREEN_CAPTURER_TYPE_AVFOUNDATION};

INSTANTIATE_TEST_SUITE_P(
    Callbacks, InsideSink,
    testing::Values(SinkCase{"OnCaptureData", {}, [](FaultBench& bench) { bench.Tick(); }},
                    SinkCase{"OnCaptureStatusChanged", {}, [](FaultBench&) {}},
                    SinkCase{"OnCaptureDisplaySizeChanged",
                             {},
                             [](FaultBench& bench) {
                                 EXPECT_TRUE(bench.desktop->ResizeDisplay(FaultBench::MAIN, {80, 60}));
                             }},
                    SinkCase{"OnCapturePositionChanged",
                             {},
                             [](FaultBench& bench) {
                                 EXPECT_EQ(bench.client->SelectSharedDisplay(FaultBench::SIDE), 0);
                             }},
                    SinkCase{"OnCapturedWindowListChanged", APP,
                             [](FaultBench& bench) {
                                 for (int i = 0; i < 10; ++i)
                                     bench.Tick();
                             }},
                    SinkCase{"OnCaptureError",
                             {},
                             [](FaultBench& bench) {
                                 EXPECT_TRUE(bench.desktop->RemoveDisplay(FaultBench::MAIN));
                             }},
                    SinkCase{"OnCaptureEvent", SESSION,
                             [](FaultBench& bench) {
                                 for (int i = 0; i < 10; ++i)
                                     bench.TickWithoutNews();
                             }}),
    [](const auto& each) { return std::string(each.param.callback); });

/// All that a client can call. `refusal` is what the engine answers to its own end.
void CallEverything(IShareCaptureEngine& engine, IShareCaptureEngineSink* sink, int refusal) {
    for (const EngineOperation& operation : EngineOperations()) {
        const int result = operation.call(engine);
        if (operation.name == "Stop") {
            EXPECT_EQ(result, refusal);
        }
    }
    if (refusal != SHARE_RESULT_OK) {
        EXPECT_EQ(DestroyShareCaptureEngine(&engine), refusal);
    }
    for (const ClientCourse& course : ClientCourses())
        course.run();
    EXPECT_EQ(engine.SetSink(sink), 0);
    EXPECT_EQ(engine.Start(), 0);
}

} // namespace

TEST_P(InsideSink, EverythingMayBeCalledAndOnlyTheEndIsRefused) {
    inside.Arm([this] { CallEverything(*bench.client, &sink, SHARE_RESULT_FAILED); });
    Run();
    ExpectToGoOn();
}

TEST_P(InsideSink, TheLibraryMayBeLetGoOf) {
    inside.Arm([] {
        EXPECT_EQ(ShareEngineInit(), 0);
        EXPECT_EQ(ShareEngineUninit(), 0);
    });
    Run();
    ExpectToGoOn();
}

TEST_P(InsideSink, ASinkMayTakeItselfAwayAndHearsNothingMore) {
    inside.Arm([this] {
        EXPECT_EQ(bench.client->SetSink(nullptr), 0);
        sink.Leave();
    });
    Run();
    for (int i = 0; i < 3; ++i)
        bench.Tick();
    EXPECT_EQ(bench.client->Pause(), 0);
    EXPECT_EQ(bench.client->Resume(), 0);
    EXPECT_EQ(bench.client->Stop(), 0);
    EXPECT_FALSE(sink.WasCalledAfterwards());
    ExpectToGoOn();
}

// ---- Callbacks of other objects

namespace {

class InsideOthers : public testing::Test {
protected:
    /// All of it once, inside, behind `before`; the engine may be ended from there.
    void Arm(
        CInside& inside, const std::function<void()>& before = [] {}) {
        bench.Start();
        inside.Arm([this, before] {
            before();
            CallEverything(*bench.client, nullptr, SHARE_RESULT_OK);
            bench.SetSink();
        });
    }
    void ExpectToGoOn(const CInside& inside) {
        inside.AwaitReturn();
        bench.ShareText();
        EXPECT_TRUE(bench.ShowsText());
    }

    FaultBench bench;
};

class CInsideSources final : public IShareSourceEnumSink {
public:
    explicit CInsideSources(CInside& inside) : m_inside(inside) {}
    int OnShareSourceEvent(SHARE_SOURCE_EVENT, IShareSource*) override {
        m_inside.Enter("OnShareSourceEvent");
        return 0;
    }

private:
    CInside& m_inside;
};

class CInsidePointer final : public ISharePointingSink {
public:
    explicit CInsidePointer(CInside& inside) : m_inside(inside) {}
    int OnPointingPosChanged(int, int) override {
        m_inside.Enter("OnPointingPosChanged");
        return 0;
    }
    int OnPointingImgChanged(ISharePointingImg*) override {
        m_inside.Enter("OnPointingImgChanged");
        return 0;
    }

private:
    CInside& m_inside;
};

class CInsideThumbnails final : public ThumbnailCallback {
public:
    explicit CInsideThumbnails(CInside& inside) : m_inside(inside) {}
    bool onAppThumbnail(unsigned, ImageData, bool, bool) override { return Hear("onAppThumbnail"); }
    bool onWindowThumbnail(unsigned, ImageData, bool, bool) override { return Hear("onWindowThumbnail"); }
    bool onThumbnailError(int) override { return Hear("onThumbnailError"); }

private:
    bool Hear(const char* callback) {
        m_inside.Enter(callback);
        return true;
    }

    CInside& m_inside;
};

class CInsideWindows final : public ITvlEnumWindowsCallback {
public:
    explicit CInsideWindows(CInside& inside) : m_inside(inside) {}
    bool OnWindow(unsigned) override {
        m_inside.Enter("OnWindow");
        return true;
    }

private:
    CInside& m_inside;
};

/// A capturer of the client's own, which has a picture of one colour.
class CInsideCapturer final : public CShareCapturerBase {
public:
    explicit CInsideCapturer(CInside& inside) : m_inside(inside) {}
    int Capture(IShareFrame* frame) override {
        m_inside.Enter("Capture");
        frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_BGRA);
        frame->SetFrameSize(8, 4);
        return SHARE_CAPTURE_OK;
    }

private:
    CInside& m_inside;
};

} // namespace

TEST_F(InsideOthers, OfSourcesEverythingMayBeCalled) {
    for (const auto type : {SHARE_SOURCE_ENUMERATOR_TYPE_MONITOR, SHARE_SOURCE_ENUMERATOR_TYPE_APP}) {
        CInside inside("OnShareSourceEvent");
        CInsideSources sink(inside);
        IShareSourceEnumerator* const list = CreateShareSourceEnumerator(type, true);
        ASSERT_NE(list, nullptr);
        EXPECT_EQ(list->AddSink(&sink), 0);
        list->Refresh();
        Arm(inside);
        if (type == SHARE_SOURCE_ENUMERATOR_TYPE_MONITOR) {
            EXPECT_TRUE(bench.desktop->RemoveDisplay(FaultBench::SIDE));
        } else {
            EXPECT_TRUE(bench.desktop->EndApplication(FaultBench::SECRETS));
        }
        ExpectToGoOn(inside);
        EXPECT_EQ(list->RemoveSink(&sink), 0);
        EXPECT_EQ(DestroyShareSourceEnumerator(list), 0);
    }
}

TEST_F(InsideOthers, OfThePointerEverythingMayBeCalled) {
    bench.desktop->SetCursor(SquareCursor(0x0000FF));
    for (const char* const callback : {"OnPointingPosChanged", "OnPointingImgChanged"}) {
        CInside inside(callback);
        CInsidePointer sink(inside);
        ISharePointing* const pointing = CreateSharePointing(SHARE_POINTING_TYPE_MOUSE, FaultBench::MAIN);
        ASSERT_NE(pointing, nullptr);
        EXPECT_EQ(pointing->AddSink(&sink), 0);
        EXPECT_EQ(pointing->Start(), 0);
        bench.desktop->SetPointer(platform::CGPoint{20, 20});
        Arm(inside);
        pointing->CapturePoint(SHARE_FRAME_FORMAT_BGRA);
        bench.desktop->SetPointer(platform::CGPoint{1000, 1000});
        ExpectToGoOn(inside);
        EXPECT_EQ(DestroySharePointing(pointing), 0);
    }
}

TEST_F(InsideOthers, OfThumbnailsEverythingMayBeCalled) {
    constexpr unsigned WINDOWS[] = {FaultBench::TEXT};
    constexpr auto EDITOR = static_cast<unsigned>(FaultBench::EDITOR);
    for (const char* const callback : {"onWindowThumbnail", "onAppThumbnail", "onThumbnailError"}) {
        CInside inside(callback);
        CInsideThumbnails takes(inside);
        std::optional<CScarceMemory> none;
        Arm(inside, [&] {
            if (none)
                none->End();
        });
        if (callback == std::string("onThumbnailError")) {
            // A worker that is still on its way out has its capturer already.
            EXPECT_TRUE(ThreadEnds("scn-thumbnail"));
            none.emplace(Poor::Others, Lack::Lasting, 0); // none for a capturer
        }
        if (callback == std::string("onAppThumbnail")) {
            EXPECT_EQ(EnumAppThumbnail(&EDITOR, 1, &takes), 0);
        } else {
            EXPECT_EQ(EnumWindowThumbnail(WINDOWS, 1, &takes), 0);
        }
        ExpectToGoOn(inside);
        CancelThumbnail(&takes);
    }
}

TEST_F(InsideOthers, OfThumbnailsTheLibraryMayBeLetGoOf) {
    constexpr unsigned WINDOWS[] = {FaultBench::TEXT};
    CInside inside("onWindowThumbnail");
    CInsideThumbnails takes(inside);
    bench.Start();
    inside.Arm([] {
        EXPECT_EQ(ShareEngineInit(), 0);
        EXPECT_EQ(ShareEngineUninit(), 0);
    });
    EXPECT_EQ(EnumWindowThumbnail(WINDOWS, 1, &takes), 0);
    ExpectToGoOn(inside);
    EXPECT_EQ(EnumWindowThumbnail(WINDOWS, 1, &takes), -1) << "that has ended them";
}

TEST_F(InsideOthers, OfAWindowListEverythingMayBeCalled) {
    CInside inside("OnWindow");
    CInsideWindows hears(inside);
    Arm(inside);
    EXPECT_EQ(TvlEnumWindows(&hears, 0), 0);
    ExpectToGoOn(inside);
}

TEST(InsideCapturer, EverythingMayBeCalledAndOnlyTheEndIsRefused) {
    CManualClockScope clock;
    const CSettingsScope settings;
    const CServedScene desktop(FaultBench::Desk());
    CInside inside("Capture");
    CInsideCapturer capturer(inside);
    CShareClient client(SHARE_CAPTURE_ENGINE_TYPE_USER_CUSTOMIZATION);
    EXPECT_EQ(client->SetExternalIShareCapturer(&capturer), 0);
    client.Start();
    inside.Arm([&] { CallEverything(*client, &client.sink, SHARE_RESULT_FAILED); });
    clock->Advance(std::chrono::milliseconds(200));
    inside.AwaitReturn();
    Settle(*WorkerOf(*client)); // or the pass would overrun the period
    const std::size_t before = client.sink.FrameCount();
    clock->Advance(std::chrono::milliseconds(200));
    EXPECT_TRUE(client.sink.WaitForFrames(before + 1));
}

// ---- A sink that takes its time

TEST(SlowSink, HoldsUpNeitherControlOperationsNorOtherEngines) {
    FaultBench bench;
    CShareClient other(SHARE_CAPTURE_ENGINE_TYPE_DESKTOP);
    EXPECT_EQ(other->SelectSharedDisplay(FaultBench::SIDE), 0);
    other.Start();
    CGate gate;
    CTally entered;
    CInside inside("OnCaptureData");
    CInsideSink sink(inside);
    inside.Arm([&] {
        entered.Add();
        EXPECT_TRUE(gate.Passes());
    });
    EXPECT_EQ(bench.client->SetSink(&sink), 0);
    EXPECT_EQ(bench.client->Start(), 0);
    bench.clock->Advance(std::chrono::milliseconds(200));
    ASSERT_TRUE(entered.Reaches(1));
    for (int i = 0; i < 25; ++i) { // five seconds
        const std::size_t before = other.sink.FrameCount();
        const auto news = static_cast<std::uint32_t>(i); // some blue or other
        EXPECT_TRUE(
            bench.desktop->SetContent(FaultBench::SIDE_WALLPAPER, platform::SimulatedContent::Colour(news)));
        Settle(*WorkerOf(*other)); // or its pass would overrun the period
        bench.clock->Advance(std::chrono::milliseconds(200));
        ASSERT_TRUE(other.sink.WaitForFrames(before + 1)) << "the other one stands still, tick " << i;
        EXPECT_EQ(bench.client->AddUnSharedWindow(FaultBench::SECRET), 0);
        EXPECT_EQ(bench.client->SetCaptureFps(5), 0);
        EXPECT_EQ(bench.client->Pause(), 0);
        EXPECT_EQ(bench.client->Resume(), 0);
        EXPECT_EQ(bench.client->GetCaptureStatus(), SHARE_CAPTURE_ENGINE_STATUS_STARTED);
    }
    gate.Open();
    inside.AwaitReturn();
    bench.SetSink();
    EXPECT_TRUE(bench.ShowsText());
    EXPECT_EQ(bench.RedSoFar(), 0);
    EXPECT_EQ(other->SetSink(nullptr), 0);
}
