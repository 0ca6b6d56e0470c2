// SPDX-License-Identifier: Apache-2.0
#include "src/app_share_config.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <string>
#include <thread>
#include <vector>

namespace {

using Lines = std::vector<std::string>;

SHARE_CAPTURE_ENGINE_TYPE EngineType(int number) {
    return static_cast<SHARE_CAPTURE_ENGINE_TYPE>(number);
}

int ShareConfigNumber(int selector, const void* value, unsigned size) {
    return ShareConfig(static_cast<SHARE_CONFIG>(selector), value, size);
}

template <class Kind>
void ExpectKind(int number) {
    SCOPED_TRACE(number);
    IShareCaptureEngine* const engine = CreateShareCaptureEngine(EngineType(number));
    ASSERT_NE(engine, nullptr);
    EXPECT_EQ(engine->GetCaptureEngineType(), EngineType(number));
    EXPECT_EQ(typeid(*engine), typeid(Kind));
    EXPECT_EQ(DestroyShareCaptureEngine(engine), 0);
}

/// Puts the process's flags back at the end of a test.
class ShareConfigFlags : public testing::Test {
protected:
    ~ShareConfigFlags() override { Flags() = 0u; }
    static ShareRelaxed<unsigned>& Flags() { return AppShareConfig::Instance()->m_nShareConfigFlags; }
};

} // namespace

TEST(CreateShareCaptureEngine, BuildsTheKindThatTheNumberNames) {
    ExpectKind<CShareCaptureEngine>(1);
    ExpectKind<CShareCaptureDesktopEngine>(2);
    ExpectKind<CShareCaptureAppEngine>(3);
    ExpectKind<CShareCaptureWindowEngine>(4);
}

TEST(CreateShareCaptureEngine, TracesTheCallBeforeItBuilds) {
    const CTraceLog trace;
    IShareCaptureEngine* const engine = CreateShareCaptureEngine(EngineType(1));
    ASSERT_NE(engine, nullptr);
    const Lines lines = trace.Lines();
    ASSERT_GE(lines.size(), 3u);
    EXPECT_EQ(lines[0], Info("[CreateShareCaptureEngine]>>eSHARE_CAPTURE_ENGINE_TYPE=1"));
    EXPECT_EQ(lines[1], Info("InitShareLib"));
    EXPECT_EQ(lines[2], Debug("CreateSharePointing(1, 4294967295)"));
    EXPECT_EQ(DestroyShareCaptureEngine(engine), 0);
}

TEST(CreateShareCaptureEngine, BuildsNothingForANumberThatIsNoKind) {
    for (const int number : {0, 5, -1}) {
        const CTraceLog trace;
        EXPECT_EQ(CreateShareCaptureEngine(EngineType(number)), nullptr);
        // No "InitShareLib": nobody holds the library.
        EXPECT_EQ(trace.Lines(), Lines{Info("[CreateShareCaptureEngine]>>eSHARE_CAPTURE_ENGINE_TYPE=" +
                                            std::to_string(number))});
    }
}

TEST(DestroyShareCaptureEngine, RefusesNullWithoutATrace) {
    const CTraceLog trace;
    EXPECT_EQ(DestroyShareCaptureEngine(nullptr), -2);
    EXPECT_EQ(trace.Lines(), Lines{});
}

TEST(DestroyShareCaptureEngine, TracesTheKindFirstAndGivesUpTheLibraryLast) {
    IShareCaptureEngine* const engine = CreateShareCaptureEngine(EngineType(3));
    const CTraceLog trace;
    EXPECT_EQ(DestroyShareCaptureEngine(engine), 0);
    const Lines lines = trace.Lines();
    ASSERT_FALSE(lines.empty());
    EXPECT_EQ(lines.front(), Info("[DestroyShareCaptureEngine]>>eSHARE_CAPTURE_ENGINE_TYPE=3"));
    EXPECT_EQ(lines.back(), Info("UninitShareLib"));
}

TEST(DestroyShareCaptureEngine, StopsAnEngineThatRuns) {
    const std::ptrdiff_t threads = CountThreadsAtRest();
    CEngineBench<> bench;
    bench.Start();
    bench.Tick();
    EXPECT_EQ(bench.sink.FrameCount(), 1u);
    EXPECT_EQ(DestroyShareCaptureEngine(bench.engine), 0);
    bench.engine = nullptr;
    EXPECT_TRUE(ThreadsComeDownTo(threads));
    EXPECT_EQ(bench.sink.Notices(), (Lines{"status 1", "status 2"}));
    EXPECT_EQ(bench.capturer.Sink(), nullptr);
}

TEST(UseShareLib, TracesOnlyTheFirstHolderInAndTheLastOneOut) {
    const CTraceLog trace;
    UseShareLib();
    EXPECT_EQ(trace.Lines(), Lines{Info("InitShareLib")});
    UseShareLib();
    ReleaseShareLib();
    EXPECT_EQ(trace.Lines(), Lines{Info("InitShareLib")});
    ReleaseShareLib();
    EXPECT_EQ(trace.Lines(), (Lines{Info("InitShareLib"), Info("UninitShareLib")}));
}

TEST(UseShareLib, IsHeldByAnEngineFromItsConstructorToItsDestructor) {
    const CTraceLog trace;
    UseShareLib();
    IShareCaptureEngine* const engine = CreateShareCaptureEngine(EngineType(1));
    EXPECT_EQ(trace.CountContaining("InitShareLib"), 1u) << "the engine was not the first holder";
    ReleaseShareLib();
    EXPECT_FALSE(trace.Contains("UninitShareLib")) << "the engine still holds the library";
    DestroyShareCaptureEngine(engine);
    EXPECT_TRUE(trace.Contains("UninitShareLib"));
}

TEST(UseShareLib, HasNoFloorUnderItsCount) {
    const CTraceLog trace;
    ReleaseShareLib(); // all bits set
    UseShareLib();     // 0 again, and not the first holder
    EXPECT_EQ(trace.Lines(), Lines{});
    UseShareLib();
    EXPECT_EQ(trace.Lines(), Lines{Info("InitShareLib")});
    ReleaseShareLib();
}

TEST(UseShareLib, CountsHoldersOfSeveralThreads) {
    const CTraceLog trace;
    UseShareLib();
    const auto holdOften = [] {
        for (int i = 0; i < 1000; ++i) {
            UseShareLib();
            ReleaseShareLib();
        }
    };
    std::thread other(holdOften);
    holdOften();
    other.join();
    EXPECT_EQ(trace.Lines(), Lines{Info("InitShareLib")});
    ReleaseShareLib();
    EXPECT_EQ(trace.Lines(), (Lines{Info("InitShareLib"), Info("UninitShareLib")}));
}

TEST_F(ShareConfigFlags, AreStoredWholeFromTheWordThatTheValuePointsTo) {
    const unsigned word = 0x80000101u;
    EXPECT_EQ(ShareConfigNumber(1, &word, sizeof word), 0);
    EXPECT_EQ(Flags(), word);
    const unsigned none = 0;
    EXPECT_EQ(ShareConfigNumber(1, &none, sizeof none), 0);
    EXPECT_EQ(Flags(), 0u);
}

TEST_F(ShareConfigFlags, AreReadAsFourBytesWhateverTheSizeSays) {
    const CTraceLog trace;
    const unsigned word = 0x01020304u;
    for (const unsigned size : {0u, 1u, 8u}) {
        Flags() = 0u;
        EXPECT_EQ(ShareConfigNumber(1, &word, size), 0);
        EXPECT_EQ(Flags(), word) << "size " << size;
    }
    EXPECT_EQ(trace.Lines(), Lines{});
}

TEST_F(ShareConfigFlags, MayLieAtAnyAddress) {
    const unsigned char bytes[5] = {0, 1, 1, 0, 0};
    EXPECT_EQ(ShareConfigNumber(1, bytes + 1, 4), 0);
    EXPECT_EQ(Flags(), 0x101u);
}

TEST_F(ShareConfigFlags, AreLeftAloneByAnUnknownSelectorWhichIsTraced) {
    Flags() = 7u;
    const unsigned word = 1;
    for (const int selector : {0, 2, -1}) {
        const CTraceLog trace;
        EXPECT_EQ(ShareConfigNumber(selector, &word, 4), 0);
        EXPECT_EQ(Flags(), 7u);
        const Lines lines = trace.Lines();
        ASSERT_EQ(lines.size(), 1u);
        EXPECT_TRUE(
            IsLineAt(lines[0], Warning("[ShareConfig] don't support eSHARE_CONFIG"), "src/share_engine"));
    }
}

TEST_F(ShareConfigFlags, AreLeftAloneByANullValueWhichIsTraced) {
    Flags() = 7u;
    for (const unsigned size : {0u, 4u}) {
        const CTraceLog trace;
        EXPECT_EQ(ShareConfigNumber(1, nullptr, size), 0);
        EXPECT_EQ(Flags(), 7u);
        const Lines lines = trace.Lines();
        ASSERT_EQ(lines.size(), 1u);
        EXPECT_TRUE(IsLineAt(lines[0],
                             Warning("[ShareConfig][SHARE_CONFIG_FLAG] error params value=0x0 value_size=" +
                                     std::to_string(size)),
                             "src/share_engine"));
    }
}

TEST_F(ShareConfigFlags, AreSeenByARunningEngineAtItsNextPass) {
    CEngineBench<> bench(true);
    bench.BeginInline();
    CShareCaptureEngine::ThreadRun(bench.engine);
    EXPECT_EQ(bench.calls.Count("CapturePoint"), 1u);
    const unsigned noPointer = SHARE_CONFIG_FLAG_NO_POINTER;
    EXPECT_EQ(ShareConfigNumber(1, &noPointer, 4), 0);
    CShareCaptureEngine::ThreadRun(bench.engine);
    EXPECT_EQ(bench.calls.Count("CapturePoint"), 1u);
    EXPECT_EQ(bench.sink.FrameCount(), 2u);
}
