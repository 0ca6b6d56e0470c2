// SPDX-License-Identifier: Apache-2.0
#include "platform/core_graphics.h"
#include "src/app_share_config.h"
#include "src/mac/app_enum_mac.h"
#include "src/mac/monitor_enum_mac.h"
#include "src/mac/share_pointing_mouse_mac.h"
#include "src/share_capturer_context.h"
#include "src/share_capturer_dummy.h"
#include "src/share_pointing_mouse.h"
#include "src/share_source_dummy.h"
#include "src/thumbnail_capture_engine.h"
#include "tests/src/mac/backend_tools.h"
#include "tests/src/thumbnail_tools.h"
#include "tests/support/call_on_thread.h"
#include "tests/support/engine_bench.h"
#include "tests/support/fake_window_server.h"
#include "tests/support/sanitizer.h"

#include <screenshare/share_engine.h>

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstddef>
#include <memory>
#include <string>
#include <typeinfo>
#include <vector>

// The exported functions other than those of engines: who builds what, and what each says about it.

namespace {

using Lines = std::vector<std::string>;

/// Has the settings of the process back at their defaults at the end of a test.
class Entry : public testing::Test {
protected:
    ~Entry() override {
        Config().m_bDummyCapture = false;
        Config().m_bDummyEnumerator = false;
        Config().m_bDummyPoint = false;
        Config().m_bCaptureDumpData = false;
        Config().m_bChangeAeroMode = true;
        Config().m_nShareConfigFlags = 0u;
    }
    static AppShareConfig& Config() { return *AppShareConfig::Instance(); }

    IShareCapturer* CreateCapturer(int type) {
        return CreateShareCapture(static_cast<SHARE_CAPTURER_TYPE>(type), context);
    }
    static IShareSourceEnumerator* CreateEnumerator(int type) {
        return CreateShareSourceEnumerator(static_cast<SHARE_SOURCE_ENUMERATOR_TYPE>(type), false);
    }

    std::shared_ptr<ShareCapturerContext> context = std::make_shared<ShareCapturerContext>();
};

template <class Class, class Interface>
testing::AssertionResult IsA(const Interface* object) {
    if (object == nullptr)
        return testing::AssertionFailure() << "null";
    if (typeid(*object) != typeid(Class))
        return testing::AssertionFailure() << "a " << typeid(*object).name();
    return testing::AssertionSuccess();
}

std::string Pointer(const void* pointer) {
    char text[32];
    CCmTextFormator out(text, sizeof text);
    out << pointer;
    return text;
}

} // namespace

// ---- The library's use

TEST_F(Entry, CountsItsClientAmongTheHoldersOfTheLibrary) {
    const CTraceLog trace;
    EXPECT_EQ(ShareEngineInit(), 0);
    EXPECT_EQ(ShareEngineInit(), 0);
    EXPECT_EQ(ShareEngineUninit(), 0);
    const std::string stop = Info("CThumbnailCaptureEngine::stop");
    EXPECT_EQ(trace.Lines(), (Lines{Info("InitShareLib"), stop}));
    EXPECT_EQ(ShareEngineUninit(), 0);
    EXPECT_EQ(trace.Lines(), (Lines{Info("InitShareLib"), stop, stop, Info("UninitShareLib")}));
}

TEST_F(Entry, RestsThePlatformWithTheLastHolderAndWithoutATrace) {
    const CFakeWindowServerScope server;
    ShareEngineInit();
    IShareCaptureEngine* const engine =
        CreateShareCaptureEngine(SHARE_CAPTURE_ENGINE_TYPE_USER_CUSTOMIZATION);
    ShareEngineUninit();
    EXPECT_EQ(server->calls.rests, 0) << "the engine still holds the library";
    const CTraceLog trace;
    DestroyShareCaptureEngine(engine);
    EXPECT_EQ(server->calls.rests, 1);
    EXPECT_EQ(trace.Lines().back(), Info("UninitShareLib"));
    ReleaseShareLib();
    UseShareLib();
    EXPECT_EQ(server->calls.rests, 1) << "one release too many is no last one";
}

TEST_F(Entry, IsFreeForAnotherHolderWhileThePlatformComesToRest) {
    class CServer : public CFakeWindowServer {
    public:
        void Rest() override {
            // A callback that the platform waits for makes an engine meanwhile.
            const CCallOnThread other([] { ShareEngineInit(); });
        }
    };
    const auto server = std::make_shared<CServer>();
    const std::shared_ptr<platform::WindowServer> former = platform::ReplaceWindowServer(server);
    CTally heard;
    const auto hear = [](unsigned, unsigned, void* tally) { static_cast<CTally*>(tally)->Add(); };
    ASSERT_EQ(platform::CGDisplayRegisterReconfigurationCallback(hear, &heard), 0);
    const CTraceLog trace;
    ShareEngineInit();
    ShareEngineUninit();
    EXPECT_EQ(trace.Lines(), (Lines{Info("InitShareLib"), Info("CThumbnailCaptureEngine::stop"),
                                    Info("UninitShareLib"), Info("InitShareLib")}));
    server->RaiseDisplayChanged(1, platform::kCGDisplayMovedFlag);
    EXPECT_TRUE(heard.Reaches(1)) << "the new holder's notices don't arrive";
    EXPECT_EQ(platform::CGDisplayRemoveReconfigurationCallback(hear, &heard), 0);
    platform::ReplaceWindowServer(former);
    ShareEngineUninit();
}

// ---- Capturers

TEST_F(Entry, BuildsADummyCapturerOfEachKindWhenDummiesAreWanted) {
    Config().m_bDummyCapture = true;
    for (const int type : {1, 2, 3, 4}) {
        const CTraceLog trace;
        IShareCapturer* const capturer = CreateCapturer(type);
        EXPECT_TRUE(IsA<CShareCapturerDummy>(capturer)) << "type " << type;
        EXPECT_EQ(trace.Lines(),
                  Lines{Info("[CreateShareCapture]>>eSHARE_CAPTURER_TYPE=" + std::to_string(type))});
        EXPECT_EQ(DestroyShareCapture(capturer), 0);
    }
}

TEST_F(Entry, BuildsADummyCapturerOnTheFlagToo) {
    Config().m_nShareConfigFlags = SHARE_CONFIG_FLAG_DUMMY_CAPTURE;
    IShareCapturer* const capturer = CreateCapturer(SHARE_CAPTURER_TYPE_WINDOW);
    EXPECT_TRUE(IsA<CShareCapturerDummy>(capturer));
    DestroyShareCapture(capturer);
}

TEST_F(Entry, BuildsTheDummyKindOfCapturerAlways) {
    IShareCapturer* const capturer = CreateCapturer(4);
    EXPECT_TRUE(IsA<CShareCapturerDummy>(capturer));
    DestroyShareCapture(capturer);
}

TEST_F(Entry, BuildsNoCapturerForANumberThatIsNoKind) {
    for (const bool isDummyWanted : {false, true}) {
        Config().m_bDummyCapture = isDummyWanted;
        for (const int type : {0, 5, -1}) {
            const CTraceLog trace;
            EXPECT_EQ(CreateCapturer(type), nullptr);
            EXPECT_EQ(trace.Lines(),
                      Lines{Info("[CreateShareCapture]>>eSHARE_CAPTURER_TYPE=" + std::to_string(type))});
        }
    }
}

TEST_F(Entry, GivesACapturerAShareOfTheContext) {
    IShareCapturer* const capturer = CreateCapturer(4);
    EXPECT_EQ(context.use_count(), 2);
    EXPECT_EQ(capturer->AddSharedWindow(3), 0);
    EXPECT_EQ(context->GetSharedWindowCount(), 1);
    EXPECT_EQ(DestroyShareCapture(capturer), 0);
    EXPECT_EQ(context.use_count(), 1);
}

TEST_F(Entry, TracesTheCapturerBeforeItIsDestroyed) {
    IShareCapturer* const capturer = CreateCapturer(4);
    const std::string name = Pointer(capturer);
    const CTraceLog trace;
    EXPECT_EQ(DestroyShareCapture(capturer), 0);
    EXPECT_EQ(DestroyShareCapture(nullptr), -2);
    EXPECT_EQ(trace.Lines(), (Lines{Info("[DestroyShareCapture]>>pIShareCapturer=" + name),
                                    Info("[DestroyShareCapture]>>pIShareCapturer=0x0")}));
}

// ---- Source lists

TEST_F(Entry, BuildsDummySourceListsWhenTheyAreWanted) {
    Config().m_bDummyEnumerator = true;
    IShareSourceEnumerator* const apps = CreateEnumerator(1);
    IShareSourceEnumerator* const monitors = CreateEnumerator(2);
    EXPECT_TRUE(IsA<CShareSourceEnumeratorDummyApp>(apps));
    EXPECT_TRUE(IsA<CShareSourceEnumeratorDummyDesktop>(monitors));
    for (IShareSourceEnumerator* const list : {apps, monitors}) {
        IShareSource* source = nullptr;
        ASSERT_EQ(list->GetSource(0, &source), 0);
        EXPECT_EQ(source->GetSourceType(), list == apps ? SHARE_SOURCE_TYPE_APP : SHARE_SOURCE_TYPE_MONITOR);
        source->Release();
        EXPECT_EQ(DestroyShareSourceEnumerator(list), 0);
    }
}

TEST_F(Entry, BuildsThePlatformsSourceListsOtherwise) {
    const CFakeWindowServerScope server;
    IShareSourceEnumerator* const apps = CreateEnumerator(1);
    IShareSourceEnumerator* const monitors = CreateEnumerator(2);
    EXPECT_TRUE(IsA<CAppEnumMac>(apps));
    EXPECT_TRUE(IsA<CMonitorEnumMac>(monitors));
    EXPECT_EQ(DestroyShareSourceEnumerator(apps), 0);
    EXPECT_EQ(DestroyShareSourceEnumerator(monitors), 0);
}

TEST_F(Entry, TracesSourceListsAndBuildsNoneForANumberThatIsNoKind) {
    const CTraceLog trace;
    for (const int type : {0, 3})
        EXPECT_EQ(CreateEnumerator(type), nullptr);
    EXPECT_EQ(trace.Lines(), (Lines{Debug("[CreateShareSourceEnumerator]>>type=0"),
                                    Debug("[CreateShareSourceEnumerator]>>type=3")}));
}

TEST_F(Entry, TracesTheSourceListBeforeItIsDestroyed) {
    Config().m_bDummyEnumerator = true;
    IShareSourceEnumerator* const list = CreateEnumerator(2);
    const std::string name = Pointer(list);
    const CTraceLog trace;
    EXPECT_EQ(DestroyShareSourceEnumerator(list), 0);
    EXPECT_EQ(trace.Lines().front(), Info("[DestroyShareSourceEnumerator]>>pEnumerator=" + name));
    EXPECT_EQ(DestroyShareSourceEnumerator(nullptr), -2);
    EXPECT_EQ(trace.Lines().back(), Info("[DestroyShareSourceEnumerator]>>pEnumerator=0x0"));
}

// ---- Pointing objects

TEST_F(Entry, BuildsADummyPointingObjectWhenItIsWanted) {
    Config().m_bDummyPoint = true;
    const CTraceLog trace;
    ISharePointing* const pointing = CreateSharePointing(SHARE_POINTING_TYPE_MOUSE, 0xFFFFFFFFu);
    EXPECT_TRUE(IsA<CSharePointingMouseDummy>(pointing));
    EXPECT_EQ(trace.Lines(), (Lines{Debug("CreateSharePointing(1, 4294967295)"),
                                    Debug("CreateSharePointing() create dummy object ")}));
    const std::string name = Pointer(pointing);
    EXPECT_EQ(DestroySharePointing(pointing), 0);
    EXPECT_EQ(trace.Lines().back(), Info("DestroySharePointing(" + name + ")"));
}

TEST_F(Entry, BuildsThePointingObjectOfThePlatformWhenNoDummyIsWanted) {
    const CTraceLog trace;
    ISharePointing* const pointing = CreateSharePointing(SHARE_POINTING_TYPE_MOUSE, 7);
    EXPECT_TRUE(IsA<CSharePointingMouseMac>(pointing));
    EXPECT_EQ(trace.Lines(),
              (Lines{Debug("CreateSharePointing(1, 7)"), Debug("CreateSharePointing() create object ")}));
    EXPECT_EQ(DestroySharePointing(pointing), 0);
}

TEST_F(Entry, BuildsNoPointingObjectForANumberThatIsNoKind) {
    Config().m_bDummyPoint = true;
    const CTraceLog trace;
    EXPECT_EQ(CreateSharePointing(static_cast<SHARE_POINTING_TYPE>(0), 7), nullptr);
    EXPECT_EQ(CreateSharePointing(static_cast<SHARE_POINTING_TYPE>(2), 7), nullptr);
    EXPECT_EQ(trace.Lines(), (Lines{Debug("CreateSharePointing(0, 7)"), Debug("CreateSharePointing(2, 7)")}));
}

TEST_F(Entry, GivesZeroWhenNoPointingObjectIsDestroyed) {
    const CTraceLog trace;
    EXPECT_EQ(DestroySharePointing(nullptr), 0);
    EXPECT_EQ(trace.Lines(), Lines{Info("DestroySharePointing(0x0)")});
}

// ---- Switches

TEST_F(Entry, SwitchesDumpsForTheProcess) {
    const CTraceLog trace;
    EXPECT_EQ(EnableScreenShareDump(true), 0);
    EXPECT_TRUE(Config().IsCaptureDumpDataEnabled());
    EXPECT_EQ(EnableScreenShareDump(false), 0);
    EXPECT_FALSE(Config().IsCaptureDumpDataEnabled());
    EXPECT_EQ(trace.Lines(), (Lines{Info("[EnableScreenShareDump]>>bEnableScreenShareDump=1"),
                                    Info("[EnableScreenShareDump]>>bEnableScreenShareDump=0")}));
}

TEST_F(Entry, KeepsTheAeroSwitch) {
    const CTraceLog trace;
    EXPECT_EQ(EnableChangeAeroMode(false), 0);
    EXPECT_FALSE(Config().m_bChangeAeroMode);
    EXPECT_EQ(EnableChangeAeroMode(true), 0);
    EXPECT_TRUE(Config().m_bChangeAeroMode);
    EXPECT_EQ(trace.Lines(), (Lines{Info("[EnableChangeAeroMode]>>bEnableChangeAeroMode=0"),
                                    Info("[EnableChangeAeroMode]>>bEnableChangeAeroMode=1")}));
}

TEST_F(Entry, DoesNotSupportEncoding) {
    const CTraceLog trace;
    EXPECT_EQ(EnableScreenShareHWEncode(), -5);
    EXPECT_EQ(trace.Lines(), Lines{});
}

// ---- Thumbnails

namespace {

/// A window of 20x10 and an application that has it.
platform::Scene DeskWithAWindow() {
    return platform::Scene().Display(0, 0, 100, 100).App(5'000'100, "Editor").Window(3).At(0, 0, 20, 10);
}

} // namespace

TEST_F(Entry, TakesRequestsForThumbnailsAndAnswersThem) {
    const CServedScene desk(DeskWithAWindow());
    const unsigned windows[] = {3, 4};
    const unsigned pid = 5'000'100;
    CThumbnailLog log;
    EXPECT_EQ(EnumWindowThumbnail(windows, 2, &log), 0);
    ASSERT_TRUE(log.lasts.Reaches(1));
    EXPECT_EQ(EnumAppThumbnail(&pid, 1, &log), 0);
    ASSERT_TRUE(log.lasts.Reaches(2));
    EXPECT_EQ(EnumAppThumbnail(nullptr, 0, &log), 0);
    ASSERT_TRUE(log.lasts.Reaches(3));
    EXPECT_EQ(log.Calls(), (ThumbnailCalls{"window 3 20x10", "window 4 failed last", "app 5000100 20x10 last",
                                           "app 5000100 20x10 last"}));
    CancelThumbnail(&log);
}

TEST_F(Entry, RefusesARequestForThumbnailsThatNobodyHears) {
    const unsigned id = 1;
    CThumbnailLog log;
    EXPECT_EQ(EnumAppThumbnail(&id, 1, nullptr), -1);
    EXPECT_EQ(EnumWindowThumbnail(&id, 1, nullptr), -1);
    EXPECT_EQ(EnumWindowThumbnail(nullptr, 0, &log), -1);
    EXPECT_EQ(EnumAppThumbnail(&id, -1, &log), -1);
    CancelThumbnail(nullptr);
}

TEST_F(Entry, CancelsThumbnailsFromInsideTheirCallback) {
    const CServedScene desk(DeskWithAWindow());
    const unsigned windows[] = {3, 3, 3};
    CThumbnailLog log([&log](std::size_t) {
        CancelThumbnail(&log);
        return true;
    });
    const CTraceLog trace;
    EXPECT_EQ(EnumWindowThumbnail(windows, 3, &log), 0);
    ASSERT_TRUE(trace.WaitUntilContains("thread exit"));
    EXPECT_EQ(log.Calls(), ThumbnailCalls{"window 3 20x10"});
}

TEST_F(Entry, EndsThumbnailsForGoodWithAnyClientThatLeaves) {
    const CServedScene desk(DeskWithAWindow());
    const unsigned window = 3;
    CThumbnailLog log;
    ShareEngineInit();
    ShareEngineInit();
    EXPECT_EQ(EnumWindowThumbnail(&window, 1, &log), 0);
    ASSERT_TRUE(log.lasts.Reaches(1));
    ShareEngineUninit(); // not the last one
    EXPECT_EQ(EnumWindowThumbnail(&window, 1, &log), -1);
    EXPECT_EQ(EnumAppThumbnail(nullptr, 0, &log), -1);
    ShareEngineUninit();
    ShareEngineInit();
    EXPECT_EQ(EnumWindowThumbnail(&window, 1, &log), -1);
    ShareEngineUninit();
    EXPECT_EQ(log.lasts.Count(), 1);
}

TEST_F(Entry, LeavesTheLibraryFromInsideAThumbnailsCallback) {
    const CServedScene desk(DeskWithAWindow());
    const unsigned windows[] = {3, 3, 3};
    ShareEngineInit();
    CThumbnailLog log([](std::size_t) { return ShareEngineUninit() == 0; });
    const CTraceLog trace;
    EXPECT_EQ(EnumWindowThumbnail(windows, 3, &log), 0);
    ASSERT_TRUE(trace.WaitUntilContains("thread exit"));
    EXPECT_EQ(log.Calls(), ThumbnailCalls{"window 3 20x10"});
    EXPECT_TRUE(trace.Contains("UninitShareLib"));
}

TEST_F(Entry, MakesThumbnailsInAForkedChildWhateverTheWorkerIsAt) {
    if (SCREENSHARE_TEST_SANITIZED)
        GTEST_SKIP() << "a sanitizer starts no threads in a child of a process with several";
    const unsigned window = 3;
    CTally entered;
    CGate gate;
    CThumbnailLog log([&](std::size_t) {
        entered.Add();
        return gate.Passes();
    });
    const CServedScene desk(DeskWithAWindow());
    ASSERT_EQ(EnumWindowThumbnail(&window, 1, &log), 0);
    ASSERT_TRUE(entered.Reaches(1)); // the worker holds the engine's mutex now
    const pid_t child = fork();
    if (child == 0) {
        alarm(30);
        const CServedScene childsDesk(DeskWithAWindow());
        CThumbnailLog childsLog;
        const bool isTaken = EnumWindowThumbnail(&window, 1, &childsLog) == 0;
        const bool isTold = isTaken && childsLog.lasts.Reaches(1);
        CancelThumbnail(&childsLog);
        CThumbnailCaptureEngine::get().stop();
        _exit(isTold ? 0 : 1);
    }
    int status = -1;
    EXPECT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(status, 0);
    gate.Open();
    EXPECT_TRUE(log.lasts.Reaches(1));
}
