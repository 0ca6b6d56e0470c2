// SPDX-License-Identifier: Apache-2.0
#include "tests/security/client_courses.h"
#include "tests/security/engine_operations.h"
#include "tests/security/fault_bench.h"
#include "tests/support/sanitizer.h"
#include "tests/support/trace_log.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <functional>
#include <iostream>

// Memory runs out at one place after the other of what a client calls, and comes back. A call fails or does
// what it says; nothing is thrown at the client, nothing is left half done, and the share goes on.

namespace {

constexpr long MANY = 1000;
/// From one place of an operation to the next; sanitizers take ten times as long.
constexpr long STEP = SCREENSHARE_TEST_SANITIZED ? 5 : 1;

struct Starved {
    int result = 0;
    bool threw = false;
    long refused = 0;
};

/// With memory for so many allocations, on the caller's thread or on those of the library.
template <class Call, class Then>
Starved CallWithLittle(Poor poor, Lack lack, long allocations, const Call& call, const Then& then) {
    Starved starved;
    CScarceMemory scarce(poor, lack, allocations);
    try {
        starved.result = call();
    } catch (...) {
        starved.threw = true;
    }
    if (poor == Poor::Caller)
        scarce.End(); // what the test does itself finds enough
    then();
    starved.refused = scarce.End();
    return starved;
}

/// Whether nobody holds the library any more.
bool IsLibraryFree() {
    const CTraceLog log(CM_TRACE_INFO);
    UseShareLib();
    const bool isFirst = log.Contains("InitShareLib");
    ReleaseShareLib();
    return isFirst;
}

class OperationsWithoutMemory : public testing::TestWithParam<FaultKind> {
protected:
    FaultBench bench{GetParam()};

    /// Each operation, without memory at each place of it in turn; then it has to be as if it had been told
    /// once with enough.
    void StarveAll(Poor poor, bool isRunning) {
        int starved = 0;
        for (const EngineOperation& operation : EngineOperations()) {
            for (const Lack lack : {Lack::Once, Lack::Lasting}) {
                for (long allocations = 0;; allocations += STEP) {
                    ASSERT_LT(allocations, MANY) << operation.name << ": there is never enough";
                    const Starved outcome = CallWithLittle(
                        poor, lack, allocations, [&] { return operation.call(*bench.client); },
                        [&] { bench.SettleWorker(); });
                    EXPECT_FALSE(outcome.threw) << operation.name << ", memory for " << allocations;
                    ASSERT_TRUE(Works(isRunning)) << operation.name << ", memory for " << allocations;
                    ASSERT_EQ(bench.RedSoFar(), 0) << operation.name << ", memory for " << allocations;
                    if (outcome.refused == 0)
                        break;
                    ++starved;
                }
            }
        }
        std::cout << starved << " calls without memory\n";
        EXPECT_GT(starved, 10);
    }

private:
    /// With the share told anew frames come that are right.
    bool Works(bool isRunning) {
        bench.SetSink();
        bench.TellModeAnew(); // an own capturer that got lost is back
        bench.ShareText();
        bench.Start();
        EXPECT_EQ(bench.client->Resume(), 0);
        const bool isRight = bench.ShowsText();
        if (!isRunning) {
            EXPECT_EQ(bench.client->Stop(), 0);
        }
        return isRight;
    }
};

INSTANTIATE_TEST_SUITE_P(Kinds, OperationsWithoutMemory,
                         testing::Values(FaultKind{}, FaultKind{SHARE_CAPTURE_ENGINE_TYPE_APP},
                                         FaultKind{SHARE_CAPTURE_ENGINE_TYPE_WINDOW}),
                         [](const auto& each) { return NameOf(each.param); });

class WithholdingWithoutMemory : public testing::Test {
protected:
    FaultBench bench;

    /// Told while it is seen; what the answer says holds for the very next frame after the worker had its
    /// turn.
    void Starve(Poor poor, const std::function<int()>& withhold, const std::function<int()>& admit) {
        for (const Lack lack : {Lack::Once, Lack::Lasting}) {
            for (long allocations = 0;; ++allocations) {
                ASSERT_LT(allocations, MANY) << "there is never enough";
                ASSERT_EQ(admit(), 0);
                bench.SettleWorker();
                for (int i = 0; i < 10 && bench.client.Last().Count(FaultBench::RED) == 0; ++i)
                    bench.Tick();
                ASSERT_GT(bench.client.Last().Count(FaultBench::RED), 0) << "nothing is kept out yet";
                bench.ForgetRed();
                const Starved outcome =
                    CallWithLittle(poor, lack, allocations, withhold, [&] { bench.SettleWorker(); });
                EXPECT_FALSE(outcome.threw) << "memory for " << allocations;
                refusals += outcome.result != 0 ? 1 : 0;
                if (outcome.result != 0) {
                    ASSERT_EQ(withhold(), 0);
                    bench.SettleWorker();
                    bench.ForgetRed();
                }
                ASSERT_TRUE(bench.ShowsText()) << "memory for " << allocations;
                ASSERT_EQ(bench.RedSoFar(), 0)
                    << "memory for " << allocations << ", answer " << outcome.result;
                if (outcome.refused == 0)
                    break;
                ++starved;
            }
        }
    }

    int starved = 0;
    int refusals = 0;
};

} // namespace

TEST_P(OperationsWithoutMemory, OfAStoppedEngineThrowNothingAndSpoilNothing) {
    StarveAll(Poor::Caller, false);
}

TEST_P(OperationsWithoutMemory, OfARunningEngineThrowNothingAndSpoilNothing) {
    bench.Start();
    StarveAll(Poor::Caller, true);
}

TEST_P(OperationsWithoutMemory, SpoilNothingWhenItIsTheEngineThatHasNone) {
    bench.Start();
    StarveAll(Poor::Others, true);
}

TEST_F(WithholdingWithoutMemory, IsRefusedOrHoldsForAWindow) {
    bench.Start();
    EXPECT_EQ(bench.client->RemoveUnSharedProcess(static_cast<unsigned>(FaultBench::SECRETS)), 0);
    // The engine first: its list of windows has never been longer than it is now.
    for (const Poor poor : {Poor::Others, Poor::Caller}) {
        Starve(
            poor, [&] { return bench.client->AddUnSharedWindow(FaultBench::SECRET); },
            [&] { return bench.client->RemoveUnSharedWindow(FaultBench::SECRET); });
    }
    std::cout << starved << " calls without memory, " << refusals << " refused\n";
    EXPECT_GT(refusals, 0);
}

TEST_F(WithholdingWithoutMemory, IsRefusedOrHoldsForAnApplication) {
    bench.Start();
    constexpr auto SECRETS = static_cast<unsigned>(FaultBench::SECRETS);
    // Somebody else instead, so that the engine's list has never been longer than it is to get now.
    EXPECT_EQ(bench.client->RemoveUnSharedProcess(SECRETS), 0);
    EXPECT_EQ(bench.client->AddUnSharedProcess(SECRETS + 1), 0);
    for (const Poor poor : {Poor::Others, Poor::Caller}) {
        Starve(
            poor, [&] { return bench.client->AddUnSharedProcess(SECRETS); },
            [&] { return bench.client->RemoveUnSharedProcess(SECRETS); });
    }
    std::cout << starved << " calls without memory, " << refusals << " refused\n";
    EXPECT_GT(refusals, 0);
}

TEST(EngineWithoutMemory, IsMadeWholeOrNotAtAll) {
    const CServedScene desktop(FaultBench::Desk());
    for (const auto kind : {SHARE_CAPTURE_ENGINE_TYPE_USER_CUSTOMIZATION, SHARE_CAPTURE_ENGINE_TYPE_DESKTOP,
                            SHARE_CAPTURE_ENGINE_TYPE_APP, SHARE_CAPTURE_ENGINE_TYPE_WINDOW}) {
        int refused = 0;
        for (const Lack lack : {Lack::Once, Lack::Lasting}) {
            for (long allocations = 0;; ++allocations) {
                ASSERT_LT(allocations, MANY) << "there is never enough";
                IShareCaptureEngine* engine = nullptr;
                const Starved outcome = CallWithLittle(
                    Poor::Caller, lack, allocations,
                    [&] {
                        engine = CreateShareCaptureEngine(kind);
                        return 0;
                    },
                    [] {});
                EXPECT_FALSE(outcome.threw) << "memory for " << allocations;
                refused += engine == nullptr ? 1 : 0;
                if (engine != nullptr) {
                    EXPECT_EQ(DestroyShareCaptureEngine(engine), 0);
                }
                ASSERT_TRUE(IsLibraryFree()) << "held by nobody, memory for " << allocations;
                if (outcome.refused == 0)
                    break;
            }
        }
        EXPECT_GT(refused, 5) << "kind " << kind;
    }
}

TEST(EngineWithoutMemory, CanBeEndedAllTheSame) {
    const std::ptrdiff_t threads = CountThreadsOfProcess();
    for (const Lack lack : {Lack::Once, Lack::Lasting}) {
        for (long allocations = 0;; ++allocations) {
            ASSERT_LT(allocations, MANY) << "there is never enough";
            const CServedScene desktop(FaultBench::Desk());
            IShareCaptureEngine* const engine = CreateShareCaptureEngine(SHARE_CAPTURE_ENGINE_TYPE_DESKTOP);
            ASSERT_NE(engine, nullptr);
            CCallLog calls;
            CRecordingSink sink(calls);
            CPlentifulSink plentiful(sink);
            EXPECT_EQ(engine->SelectSharedDisplay(FaultBench::MAIN), 0);
            EXPECT_EQ(engine->SetSink(&plentiful), 0);
            EXPECT_EQ(engine->Start(), 0);
            const Starved outcome = CallWithLittle(
                Poor::Caller, lack, allocations, [&] { return DestroyShareCaptureEngine(engine); }, [] {});
            EXPECT_FALSE(outcome.threw) << "memory for " << allocations;
            EXPECT_EQ(outcome.result, 0) << "memory for " << allocations;
            if (outcome.result != 0) {
                ASSERT_EQ(DestroyShareCaptureEngine(engine), 0);
            }
            ASSERT_TRUE(IsLibraryFree()) << "memory for " << allocations;
            ASSERT_TRUE(ThreadsComeDownTo(threads)) << "memory for " << allocations;
            if (outcome.refused == 0)
                break;
        }
    }
}

TEST(ClientWithoutMemory, IsThrownNothingAtWhateverItMakes) {
    const CSettingsScope settings;
    const CServedScene desktop(FaultBench::Desk());
    for (const ClientCourse& course : ClientCourses()) {
        int starved = 0;
        for (const Lack lack : {Lack::Once, Lack::Lasting}) {
            for (long allocations = 0;; ++allocations) {
                ASSERT_LT(allocations, 10 * MANY) << course.name << ": there is never enough";
                const Starved outcome = CallWithLittle(
                    Poor::Caller, lack, allocations,
                    [&] {
                        course.run();
                        return 0;
                    },
                    [] {});
                EXPECT_FALSE(outcome.threw) << course.name << ", memory for " << allocations;
                if (outcome.refused == 0)
                    break;
                ++starved;
            }
        }
        std::cout << course.name << ": " << starved << " times without memory\n";
    }
    EXPECT_TRUE(IsLibraryFree());
}
