// SPDX-License-Identifier: Apache-2.0
#include "tests/src/share_capturer_tools.h"
#include "tests/support/engine_bench.h"
#include "tests/support/test_effort.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <cstdio>
#include <string>
#include <thread>
#include <utility>
#include <vector>

// The sources of a capturer: how they come and go, who is told, and when they are released.

namespace {

using Lines = std::vector<std::string>;

} // namespace

TEST_F(ShareCapturer, RefusesANullSource) {
    EXPECT_EQ(capturer.AddCaptureShareSource(nullptr), -1);
    EXPECT_EQ(capturer.RemoveCaptureShareSource(nullptr), -1);
    EXPECT_EQ(capturer.GetCaptureShareSourceCount(), 0);
    EXPECT_EQ(capturer.FindShareSource(nullptr), capturer.m_vecShareSources.end());
    EXPECT_EQ(trace.Lines(), Lines{});
}

TEST_F(ShareCapturer, HoldsAReferenceOnASourceAndTellsOfIt) {
    IShareSource* const source = Source(4);
    capturer.AddSink(&sink);
    EXPECT_EQ(capturer.AddCaptureShareSource(source), 0);
    EXPECT_EQ(source->GetReference(), 2u);
    EXPECT_EQ(capturer.GetCaptureShareSourceCount(), 1);
    EXPECT_EQ(calls.Calls(), Lines{"added 4"});
    const Lines lines = trace.Lines();
    ASSERT_EQ(lines.size(), 1u);
    EXPECT_TRUE(
        lines[0].starts_with(Info("[CShareCapturer::NotifyCaptureShareSourceModified]>>pIShareSource=0x")));
    EXPECT_TRUE(lines[0].ends_with(" notify type=0"));
}

TEST_F(ShareCapturer, TakesASourceOnlyOnceAndTracesTheSecondTime) {
    IShareSource* const source = Source(4);
    capturer.AddCaptureShareSource(source);
    capturer.AddSink(&sink);
    trace.Clear();
    EXPECT_EQ(capturer.AddCaptureShareSource(source), -1);
    EXPECT_EQ(source->GetReference(), 2u);
    EXPECT_EQ(capturer.GetCaptureShareSourceCount(), 1);
    EXPECT_EQ(trace.Lines(), Lines{Info("[CShareCapturer::AddCaptureShareSource] already exist")});
    EXPECT_EQ(calls.Calls(), Lines{});
}

TEST_F(ShareCapturer, GivesSourcesByIndexWithoutAReference) {
    IShareSource* const first = Source(1);
    IShareSource* const second = Source(2);
    capturer.AddCaptureShareSource(first);
    capturer.AddCaptureShareSource(second);
    EXPECT_EQ(capturer.GetCaptureShareSource(0), first);
    EXPECT_EQ(capturer.GetCaptureShareSource(1), second);
    EXPECT_EQ(second->GetReference(), 2u);
    EXPECT_EQ(capturer.GetCaptureShareSource(2), nullptr);
    EXPECT_EQ(capturer.GetCaptureShareSource(-1), nullptr);
    EXPECT_EQ(capturer.FindShareSource(second), capturer.m_vecShareSources.begin() + 1);
}

TEST_F(ShareCapturer, RemovesASourceAndTellsOfItFirst) {
    IShareSource* const source = Source(4);
    capturer.AddCaptureShareSource(source);
    capturer.AddSink(&sink);
    sink.hook = [&] { EXPECT_EQ(capturer.GetCaptureShareSource(0), source) << "told before it leaves"; };
    trace.Clear();
    EXPECT_EQ(capturer.RemoveCaptureShareSource(source), 0);
    EXPECT_EQ(source->GetReference(), 1u);
    EXPECT_EQ(capturer.GetCaptureShareSourceCount(), 0);
    EXPECT_EQ(calls.Calls(), Lines{"removed 4"});
    const Lines lines = trace.Lines();
    ASSERT_EQ(lines.size(), 2u);
    EXPECT_EQ(lines[0], Info("[CShareCapturer::RemoveCaptureShareSource] RemoveSharedApp result=-1"));
    EXPECT_TRUE(lines[1].ends_with(" notify type=1"));
}

TEST_F(ShareCapturer, TakesTheIdOffTheSharedApplicationsWhateverTheSourceIs) {
    for (const ShareSourceType type :
         {SHARE_SOURCE_TYPE_APP, SHARE_SOURCE_TYPE_MONITOR, static_cast<ShareSourceType>(3)}) {
        IShareSource* const source = Source(42, type);
        context->AddSharedApp(42);
        EXPECT_EQ(capturer.RemoveCaptureShareSource(source), -1) << "it was never added";
        EXPECT_FALSE(context->IsAppShared(42)) << "type " << type;
    }
}

TEST_F(ShareCapturer, CutsAnIdTo32BitsForItsContext) {
    context->AddSharedApp(42);
    EXPECT_EQ(capturer.RemoveCaptureShareSource(Source(0x10000002AuL)), -1);
    EXPECT_EQ(context->GetSharedAppCount(), 0);
}

TEST_F(ShareCapturer, ReleasesASourceBeforeItLeavesTheList) {
    auto* const source = new CLoggedSource(calls, 4);
    source->atEnd = [&] {
        EXPECT_EQ(capturer.GetCaptureShareSource(0), nullptr) << "nobody is handed a dying source";
        return " of " + std::to_string(capturer.GetCaptureShareSourceCount());
    };
    capturer.AddCaptureShareSource(source); // the only reference is the list's
    EXPECT_EQ(capturer.RemoveCaptureShareSource(source), 0);
    EXPECT_EQ(calls.Calls(), Lines{"source 4 gone of 1"});
    EXPECT_EQ(capturer.GetCaptureShareSourceCount(), 0);
}

TEST_F(ShareCapturer, ReleasesASourceThatIsRemovedByItsProcessAfterItHasLeftTheList) {
    auto* const source = new CLoggedSource(calls, 4, SHARE_SOURCE_TYPE_APP);
    source->atEnd = [&] { return " of " + std::to_string(capturer.GetCaptureShareSourceCount()); };
    capturer.AddCaptureShareSource(source);
    EXPECT_EQ(capturer.RemoveCaptureShareSourceApp(4), 0);
    EXPECT_EQ(calls.Calls(), Lines{"source 4 gone of 0"});
}

TEST_F(ShareCapturer, RemovesTheFirstApplicationOfAProcess) {
    IShareSource* const monitor = Source(4, SHARE_SOURCE_TYPE_MONITOR);
    IShareSource* const wide = Source(0x100000004uL, SHARE_SOURCE_TYPE_APP);
    IShareSource* const app = Source(4, SHARE_SOURCE_TYPE_APP);
    IShareSource* const again = Source(4, SHARE_SOURCE_TYPE_APP);
    for (IShareSource* const source : {monitor, wide, app, again})
        capturer.AddCaptureShareSource(source);
    capturer.m_vecShareSources.insert(capturer.m_vecShareSources.begin(), nullptr);
    capturer.AddSink(&sink);
    context->AddSharedApp(4);
    EXPECT_EQ(capturer.RemoveCaptureShareSourceApp(5), -1);
    EXPECT_EQ(calls.Calls(), Lines{});
    EXPECT_EQ(capturer.RemoveCaptureShareSourceApp(4), 0);
    EXPECT_EQ(calls.Calls(), Lines{"removed 4"});
    EXPECT_EQ(capturer.m_vecShareSources, (std::vector<IShareSource*>{nullptr, monitor, wide, again}));
    EXPECT_EQ(app->GetReference(), 1u);
    EXPECT_TRUE(context->IsAppShared(4)) << "the context is the caller's business";
}

TEST_F(ShareCapturer, IsNotUpsetByASinkThatRemovesTheSourceItself) {
    IShareSource* const source = Source(4, SHARE_SOURCE_TYPE_APP);
    capturer.AddSink(&sink);
    bool again = true;
    sink.hook = [&] {
        if (std::exchange(again, false)) {
            EXPECT_EQ(capturer.RemoveCaptureShareSource(source), 0);
        }
    };
    capturer.m_vecShareSources.push_back(source);
    source->AddRef();
    EXPECT_EQ(capturer.RemoveCaptureShareSource(source), 0);
    EXPECT_EQ(source->GetReference(), 1u);
    again = true;
    capturer.m_vecShareSources.push_back(source);
    source->AddRef();
    EXPECT_EQ(capturer.RemoveCaptureShareSourceApp(4), 0);
    EXPECT_EQ(source->GetReference(), 1u);
    EXPECT_EQ(capturer.GetCaptureShareSourceCount(), 0);
}

TEST_F(ShareCapturer, TellsNobodyOfAnUnknownKindOfChange) {
    capturer.AddSink(&sink);
    for (const int kind : {-1, 2}) {
        trace.Clear();
        capturer.NotifyCaptureShareSourceModified(nullptr, static_cast<SHARE_CAPTURER_SOURCE_NOTIFY>(kind));
        EXPECT_EQ(
            trace.Lines(),
            Lines{Info("[CShareCapturer::NotifyCaptureShareSourceModified]>>pIShareSource=0x0 notify type=" +
                       std::to_string(kind))});
    }
    EXPECT_EQ(calls.Calls(), Lines{});
}

TEST_F(ShareCapturer, LetsGoOfSourcesAndSinksAtItsEnd) {
    IShareSource* const source = Source(4);
    {
        CCapturerProbe other(context);
        other.AddSink(&sink);
        other.AddCaptureShareSource(source);
        other.m_vecShareSources.push_back(nullptr);
        calls.Clear();
    }
    EXPECT_EQ(source->GetReference(), 1u);
    EXPECT_EQ(calls.Calls(), Lines{}) << "nobody is told";

    capturer.AddSink(&sink);
    capturer.AddCaptureShareSource(source);
    capturer.Cleanup();
    EXPECT_EQ(source->GetReference(), 1u);
    EXPECT_TRUE(capturer.m_vecSinks.empty());
    EXPECT_EQ(capturer.GetCaptureShareSourceCount(), 0);
}

TEST_F(ShareCapturerAlone, RemovesASourceAllTheSame) {
    IShareSource* const source = Source(4);
    capturer.AddCaptureShareSource(source);
    EXPECT_EQ(capturer.RemoveCaptureShareSource(source), 0);
    EXPECT_EQ(capturer.RemoveCaptureShareSource(source), -1);
}

// ---- Threads

TEST_F(ShareCapturer, TakesSinksAndSourcesFromSeveralThreadsAtOnce) {
    const int rounds = 300 * TestEffort();
    std::printf("rounds: %d\n", rounds);
    capturer.AddSink(&sink);
    std::vector<std::thread> threads;
    for (unsigned long id = 1; id <= 3; ++id) {
        threads.emplace_back([this, rounds, source = ShareRef<IShareSource>(Source(id))] {
            CCallLog ownCalls;
            CCapturerSink own(ownCalls);
            for (int i = 0; i < rounds; ++i) {
                EXPECT_EQ(capturer.AddSink(&own), 0);
                EXPECT_EQ(capturer.AddCaptureShareSource(source.Get()), 0);
                capturer.NotifyCaptureDisplayChanged(true);
                int x = 0;
                capturer.GetCurrentCaptureSourcePosition(x, x, x, x);
                EXPECT_GE(capturer.GetCaptureShareSourceCount(), 1);
                EXPECT_EQ(capturer.RemoveCaptureShareSource(source.Get()), 0);
                EXPECT_EQ(capturer.RemoveSink(&own), 0);
                const std::size_t heard = ownCalls.Calls().size();
                EXPECT_GE(heard, 3u);
                ownCalls.Clear();
            }
        });
    }
    for (std::thread& thread : threads)
        thread.join();
    EXPECT_EQ(calls.Count("display 1"), static_cast<std::size_t>(3 * rounds));
    EXPECT_EQ(capturer.GetCaptureShareSourceCount(), 0);
    EXPECT_EQ(capturer.m_vecSinks.size(), 1u);
}
