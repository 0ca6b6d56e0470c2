// SPDX-License-Identifier: Apache-2.0
#include "src/share_source_enum.h"

#include "src/share_source.h"
#include "tests/src/share_source_enum_tools.h"
#include "tests/src/share_source_tools.h"
#include "tests/support/call_on_thread.h"
#include "tests/support/trace_log.h"

#include <gtest/gtest.h>

#include <functional>
#include <stdexcept>
#include <string>
#include <vector>

namespace {

using Ids = std::vector<unsigned long>;
using Lines = std::vector<std::string>;
using Told = std::vector<SourceEvent>;

class ShareSourceEnumerator : public testing::Test {
protected:
    COpenEnumerator enumerator;
};

// ---- Sources

TEST_F(ShareSourceEnumerator, StartsEmptyAndOfNoType) {
    EXPECT_EQ(NumberOf(enumerator), 0);
    EXPECT_EQ(enumerator.GetShareSourceEnumeratorType(), 0);
    EXPECT_FALSE(enumerator.HasSourceObserver());
}

TEST_F(ShareSourceEnumerator, DoesNothingOnARefresh) {
    enumerator.Append(1);
    const CTraceLog trace;
    enumerator.Refresh();
    EXPECT_TRUE(trace.Lines().empty());
    EXPECT_EQ(IdsOf(enumerator), (Ids{1}));
}

TEST_F(ShareSourceEnumerator, TellsTheNumberOfItsSources) {
    enumerator.Append(1);
    enumerator.Append(2);
    const CTraceLog trace;
    int number = -1;
    EXPECT_EQ(enumerator.GetNumber(number), 0);
    EXPECT_EQ(number, 2);
    EXPECT_EQ(trace.Lines(), (Lines{DebugLine("[CShareSourceEnumerator::GetNumber]>>number=2")}));
}

TEST_F(ShareSourceEnumerator, TellsTheNumberAfterEachChange) {
    for (unsigned long id = 1; id <= 4; ++id) {
        enumerator.Append(id);
        EXPECT_EQ(NumberOf(enumerator), static_cast<int>(id));
    }
    enumerator.RemoveSourceById(2, nullptr);
    EXPECT_EQ(NumberOf(enumerator), 3);
    enumerator.CleanShareSource();
    EXPECT_EQ(NumberOf(enumerator), 0);
}

TEST_F(ShareSourceEnumerator, TellsTheNumberWhileAnotherThreadHoldsTheList) {
    // A source that takes its time to go holds the list meanwhile.
    struct Slow : CShareSource {
        explicit Slow(std::function<void()> end) : m_end(std::move(end)) {}
        ~Slow() override { m_end(); }
        std::function<void()> m_end;
    };
    CTally ending;
    CGate gate;
    enumerator.AppendSource(new Slow([&] {
        ending.Add();
        EXPECT_TRUE(gate.Passes());
    }));
    CCallOnThread clean([this] { enumerator.CleanShareSource(); });
    ASSERT_TRUE(ending.Reaches(1));
    EXPECT_EQ(NumberOf(enumerator), 0);
    gate.Open();
}

TEST_F(ShareSourceEnumerator, HandsOutASourceWithAReference) {
    IShareSource* const first = enumerator.Append(1);
    IShareSource* out = nullptr;
    const CTraceLog trace;
    EXPECT_EQ(enumerator.GetSource(0, &out), 0);
    EXPECT_EQ(trace.Lines(), (Lines{DebugLine("[CShareSourceEnumerator::GetSource]>>index=0")}));
    EXPECT_EQ(out, first);
    EXPECT_EQ(out->GetReference(), 2u);
    out->Release();
}

TEST_F(ShareSourceEnumerator, LeavesWhatTheCallerHasForABadIndex) {
    IShareSource* const first = enumerator.Append(1);
    IShareSource* out = first;
    EXPECT_EQ(enumerator.GetSource(-1, &out), -1);
    EXPECT_EQ(enumerator.GetSource(1, &out), -1);
    EXPECT_EQ(enumerator.GetSource(0, nullptr), -1);
    EXPECT_EQ(out, first);
    EXPECT_EQ(first->GetReference(), 1u);
}

TEST_F(ShareSourceEnumerator, HandsOutAnEmptyPlaceAsItIs) {
    enumerator.AppendNull();
    IShareSource* const other = enumerator.Append(1);
    IShareSource* out = other;
    EXPECT_EQ(enumerator.GetSource(0, &out), 0);
    EXPECT_EQ(out, nullptr);
    CHeldSource found;
    EXPECT_EQ(enumerator.GetSourceBySourceId(1, found.Out()), 0);
    EXPECT_EQ(found.Get(), other);
    EXPECT_TRUE(enumerator.RemoveSourceById(1, nullptr));
    EXPECT_EQ(NumberOf(enumerator), 1);
}

TEST_F(ShareSourceEnumerator, FindsTheFirstSourceWithAnId) {
    enumerator.Append(1);
    IShareSource* const second = enumerator.Append(2);
    enumerator.Append(2);
    IShareSource* out = nullptr;
    EXPECT_EQ(enumerator.GetSourceBySourceId(2, &out), 0);
    EXPECT_EQ(out, second);
    EXPECT_EQ(out->GetReference(), 2u);
    out->Release();
}

TEST_F(ShareSourceEnumerator, ComparesIdsInFullWidth) {
    enumerator.Append(5);
    CHeldSource out;
    EXPECT_EQ(enumerator.GetSourceBySourceId(0x100000005, out.Out()), -1);
    EXPECT_FALSE(enumerator.RemoveSourceById(0x100000005, out.Out()));
    EXPECT_EQ(out.Get(), nullptr);
}

TEST_F(ShareSourceEnumerator, ReplacesWhatTheCallerHasByTheSourceThatItFinds) {
    IShareSource* const first = enumerator.Append(1);
    IShareSource* const second = enumerator.Append(2);
    IShareSource* out = first;
    EXPECT_EQ(enumerator.GetSourceBySourceId(2, &out), 0);
    EXPECT_EQ(out, second);
    EXPECT_EQ(first->GetReference(), 1u);
    out->Release();
}

TEST_F(ShareSourceEnumerator, TakesWhatTheCallerHasForASourceOfAnUnknownId) {
    IShareSource* const first = enumerator.Append(1);
    IShareSource* out = first;
    EXPECT_EQ(enumerator.GetSourceBySourceId(9, &out), 0);
    EXPECT_EQ(out, first);
    EXPECT_EQ(first->GetReference(), 2u);
    out->Release();
}

TEST_F(ShareSourceEnumerator, FindsNothingForAnUnknownIdOrWithoutAPlaceForIt) {
    enumerator.Append(1);
    IShareSource* out = nullptr;
    EXPECT_EQ(enumerator.GetSourceBySourceId(9, &out), -1);
    EXPECT_EQ(out, nullptr);
    EXPECT_EQ(enumerator.GetSourceBySourceId(1, nullptr), -1);
}

TEST_F(ShareSourceEnumerator, TakesASourceOffAndHandsItOut) {
    enumerator.Append(1);
    IShareSource* const second = enumerator.Append(2);
    enumerator.Append(3);
    CHeldSource out;
    EXPECT_TRUE(enumerator.RemoveSourceById(2, out.Out()));
    EXPECT_EQ(out.Get(), second);
    EXPECT_EQ(out->GetReference(), 1u);
    EXPECT_EQ(IdsOf(enumerator), (Ids{1, 3}));
}

TEST_F(ShareSourceEnumerator, TakesOffTheFirstOfTwoSourcesWithOneId) {
    enumerator.Append(2);
    IShareSource* const second = enumerator.Append(2);
    EXPECT_TRUE(enumerator.RemoveSourceById(2, nullptr));
    CHeldSource left;
    ASSERT_EQ(enumerator.GetSource(0, left.Out()), 0);
    EXPECT_EQ(left.Get(), second);
}

TEST_F(ShareSourceEnumerator, EndsASourceThatIsTakenOffAndThatNobodyHolds) {
    enumerator.Append(1);
    enumerator.Append(2);
    EXPECT_TRUE(enumerator.RemoveSourceById(1, nullptr));
    EXPECT_EQ(COpenEnumerator::alive, 1);
    EXPECT_EQ(IdsOf(enumerator), (Ids{2}));
}

TEST_F(ShareSourceEnumerator, LeavesEverythingForTheRemovalOfAnUnknownId) {
    IShareSource* const first = enumerator.Append(1);
    IShareSource* out = first;
    EXPECT_FALSE(enumerator.RemoveSourceById(9, &out));
    EXPECT_FALSE(enumerator.RemoveSourceById(9, nullptr));
    EXPECT_EQ(out, first);
    EXPECT_EQ(first->GetReference(), 1u);
    EXPECT_EQ(IdsOf(enumerator), (Ids{1}));
}

TEST_F(ShareSourceEnumerator, ForgetsItsSourcesWithoutAnEvent) {
    CSourceSink sink;
    enumerator.AddSink(&sink);
    enumerator.Append(1);
    enumerator.Append(2);
    CHeldSource held;
    ASSERT_EQ(enumerator.GetSource(0, held.Out()), 0);
    const CTraceLog trace;
    enumerator.CleanShareSource();
    EXPECT_EQ(trace.Lines(), (Lines{DebugLine("[CShareSourceEnumerator::CleanShareSource]")}));
    EXPECT_EQ(NumberOf(enumerator), 0);
    EXPECT_EQ(held->GetReference(), 1u);
    EXPECT_EQ(COpenEnumerator::alive, 1);
    EXPECT_TRUE(sink.Told().empty());
}

TEST_F(ShareSourceEnumerator, TakesAFilterWithoutUsingIt) {
    struct Filter : IShareSourceFilter {};
    Filter filter;
    enumerator.Append(1);
    const CTraceLog trace;
    enumerator.SetFilter(&filter);
    enumerator.SetFilter(nullptr);
    EXPECT_EQ(trace.Lines(),
              (Lines{InfoLine("[CShareSourceEnumerator::SetFilter]>>pFilter=" + PointerText(&filter)),
                     InfoLine("[CShareSourceEnumerator::SetFilter]>>pFilter=" + PointerText(nullptr))}));
    EXPECT_EQ(IdsOf(enumerator), (Ids{1}));
}

// ---- Sinks

TEST_F(ShareSourceEnumerator, RefusesANullSink) {
    const CTraceLog trace;
    EXPECT_EQ(enumerator.AddSink(nullptr), -1);
    EXPECT_EQ(enumerator.RemoveSink(nullptr), -1);
    EXPECT_EQ(trace.Lines(), (Lines{InfoLine("[CShareSourceEnumerator::AddSink]>>pIShareSourceEnumSink=" +
                                             PointerText(nullptr) + ",this=" + PointerText(&enumerator)),
                                    InfoLine("[CShareSourceEnumerator::RemoveSink]>>pIShareSourceEnumSink=" +
                                             PointerText(nullptr))}));
    EXPECT_FALSE(enumerator.HasSourceObserver());
}

TEST_F(ShareSourceEnumerator, TakesASinkOnce) {
    CSourceSink sink;
    IShareSourceEnumSink* const address = &sink;
    const std::string added =
        InfoLine("[CShareSourceEnumerator::AddSink]>>pIShareSourceEnumSink=" + PointerText(address) +
                 ",this=" + PointerText(&enumerator));
    const std::string sought =
        DebugLine("[CShareSourceEnumerator::FindSink]>>lpSink=" + PointerText(address));
    CTraceLog trace;
    EXPECT_EQ(enumerator.AddSink(&sink), 0);
    EXPECT_EQ(trace.Lines(), (Lines{added, sought}));
    EXPECT_TRUE(enumerator.HasSourceObserver());

    trace.Clear();
    EXPECT_EQ(enumerator.AddSink(&sink), -1);
    const Lines lines = trace.Lines();
    ASSERT_EQ(lines.size(), 4u);
    EXPECT_EQ(lines[0], added);
    EXPECT_EQ(lines[1], sought);
    EXPECT_EQ(lines[2], DebugLine("[CShareSourceEnumerator::FindSink] get it"));
    EXPECT_TRUE(IsLineAt(
        lines[3], "[[ScreenShare],[Core]] WARNING: [CShareSourceEnumerator::AddSink] fail already exist",
        "src/share_source_enum"));

    enumerator.OnShareSourceEvent(SHARE_SOURCE_EVENT_ADDED, enumerator.Append(1));
    EXPECT_EQ(sink.Told(), (Told{{SHARE_SOURCE_EVENT_ADDED, 1}}));
}

TEST_F(ShareSourceEnumerator, RemovesASinkThatIsThere) {
    CSourceSink sink;
    IShareSourceEnumSink* const address = &sink;
    enumerator.AddSink(&sink);
    const CTraceLog trace;
    EXPECT_EQ(enumerator.RemoveSink(&sink), 0);
    EXPECT_EQ(enumerator.RemoveSink(&sink), -1);
    const std::string asked =
        InfoLine("[CShareSourceEnumerator::RemoveSink]>>pIShareSourceEnumSink=" + PointerText(address));
    const std::string sought =
        DebugLine("[CShareSourceEnumerator::FindSink]>>lpSink=" + PointerText(address));
    EXPECT_EQ(trace.Lines(),
              (Lines{asked, sought, DebugLine("[CShareSourceEnumerator::FindSink] get it"),
                     InfoLine("[CShareSourceEnumerator::RemoveSink] success"), asked, sought}));
    EXPECT_FALSE(enumerator.HasSourceObserver());
}

TEST_F(ShareSourceEnumerator, HasNoObserverAfterItsSinksAreCleaned) {
    CSourceSink first;
    CSourceSink second;
    enumerator.AddSink(&first);
    enumerator.AddSink(&second);
    const CTraceLog trace;
    EXPECT_EQ(enumerator.CleanSink(), 0);
    EXPECT_EQ(trace.Lines(), (Lines{DebugLine("[CShareSourceEnumerator::CleanSink]")}));
    EXPECT_FALSE(enumerator.HasSourceObserver());
    EXPECT_EQ(enumerator.OnShareSourceEvent(SHARE_SOURCE_EVENT_ADDED, enumerator.Append(1)), 0);
    EXPECT_TRUE(first.Told().empty());
}

// ---- Events

TEST_F(ShareSourceEnumerator, CallsItsSinksInTheOrderOfAdding) {
    std::vector<int> order;
    CSourceSink first([&](SHARE_SOURCE_EVENT, IShareSource*) { order.push_back(1); });
    CSourceSink second([&](SHARE_SOURCE_EVENT, IShareSource*) { order.push_back(2); });
    CSourceSink third([&](SHARE_SOURCE_EVENT, IShareSource*) { order.push_back(3); });
    for (CSourceSink* const sink : {&first, &second, &third})
        enumerator.AddSink(sink);
    IShareSource* const source = enumerator.Append(1);
    enumerator.OnShareSourceEvent(SHARE_SOURCE_EVENT_ADDED, source);
    enumerator.RemoveSink(&second);
    enumerator.OnShareSourceEvent(SHARE_SOURCE_EVENT_UPDATED, source);
    EXPECT_EQ(order, (std::vector<int>{1, 2, 3, 1, 3}));
}

TEST_F(ShareSourceEnumerator, TracesAnEventWithTheIdBehindIt) {
    IShareSource* const source = enumerator.Append(42);
    const CTraceLog trace;
    EXPECT_EQ(enumerator.OnShareSourceEvent(SHARE_SOURCE_EVENT_UPDATED, source), 0);
    EXPECT_EQ(trace.Lines(), (Lines{InfoLine("[CShareSourceEnumerator::OnShareSourceEvent] event=242")}));
}

TEST_F(ShareSourceEnumerator, StopsAnEventWithoutASource) {
    CSourceSink sink;
    enumerator.AddSink(&sink);
    const CTraceLog trace;
    EXPECT_EQ(enumerator.OnShareSourceEvent(SHARE_SOURCE_EVENT_ADDED, nullptr), -1);
    EXPECT_TRUE(trace.Lines().empty());
    EXPECT_TRUE(sink.Told().empty());
}

TEST_F(ShareSourceEnumerator, GivesTheSinkASourceWithoutAnotherReference) {
    CSourceSink sink([](SHARE_SOURCE_EVENT, IShareSource* source) { EXPECT_EQ(source->GetReference(), 1u); });
    enumerator.AddSink(&sink);
    enumerator.OnShareSourceEvent(SHARE_SOURCE_EVENT_ADDED, enumerator.Append(1));
    EXPECT_EQ(sink.Told().size(), 1u);
}

TEST_F(ShareSourceEnumerator, CallsASinkThatIsAddedInsideAnEvent) {
    CSourceSink late;
    CSourceSink adding([&](SHARE_SOURCE_EVENT, IShareSource*) { enumerator.AddSink(&late); });
    enumerator.AddSink(&adding);
    enumerator.OnShareSourceEvent(SHARE_SOURCE_EVENT_ADDED, enumerator.Append(1));
    EXPECT_EQ(late.Told().size(), 1u);
}

TEST_F(ShareSourceEnumerator, PassesOverTheSinkBehindOneThatRemovesItself) {
    CSourceSink leaving([&](SHARE_SOURCE_EVENT, IShareSource*) { enumerator.RemoveSink(&leaving); });
    CSourceSink second;
    CSourceSink third;
    for (CSourceSink* const sink : {&leaving, &second, &third})
        enumerator.AddSink(sink);
    IShareSource* const source = enumerator.Append(1);
    enumerator.OnShareSourceEvent(SHARE_SOURCE_EVENT_ADDED, source);
    EXPECT_EQ(second.Told().size(), 0u);
    EXPECT_EQ(third.Told().size(), 1u);
    enumerator.OnShareSourceEvent(SHARE_SOURCE_EVENT_UPDATED, source);
    EXPECT_EQ(leaving.Told().size(), 1u);
    EXPECT_EQ(second.Told().size(), 1u);
}

TEST_F(ShareSourceEnumerator, EndsAnEventWhoseSinkCleansTheList) {
    CSourceSink cleaning([&](SHARE_SOURCE_EVENT, IShareSource*) { enumerator.CleanSink(); });
    CSourceSink second;
    enumerator.AddSink(&cleaning);
    enumerator.AddSink(&second);
    EXPECT_EQ(enumerator.OnShareSourceEvent(SHARE_SOURCE_EVENT_ADDED, enumerator.Append(1)), 0);
    EXPECT_TRUE(second.Told().empty());
}

TEST_F(ShareSourceEnumerator, MayBeAskedAndChangedInsideAnEvent) {
    CSourceSink sink([&](SHARE_SOURCE_EVENT, IShareSource*) {
        EXPECT_EQ(IdsOf(enumerator), (Ids{1}));
        enumerator.Append(2);
    });
    enumerator.AddSink(&sink);
    enumerator.OnShareSourceEvent(SHARE_SOURCE_EVENT_ADDED, enumerator.Append(1));
    EXPECT_EQ(IdsOf(enumerator), (Ids{1, 2}));
}

TEST_F(ShareSourceEnumerator, GoesOnBehindASinkThatThrows) {
    CSourceSink throwing([](SHARE_SOURCE_EVENT, IShareSource*) { throw std::runtime_error("mine"); });
    CSourceSink second;
    enumerator.AddSink(&throwing);
    enumerator.AddSink(&second);
    const CTraceLog trace(CM_TRACE_ERROR);
    EXPECT_EQ(enumerator.OnShareSourceEvent(SHARE_SOURCE_EVENT_ADDED, enumerator.Append(1)), 0);
    EXPECT_EQ(second.Told().size(), 1u);
    ASSERT_EQ(trace.Lines().size(), 1u);
    EXPECT_TRUE(IsLineAt(trace.Lines()[0],
                         "[[ScreenShare],[Core]] ERROR: [CShareSourceEnumerator::OnShareSourceEvent] "
                         "sink threw mine",
                         "src/share_source_enum"));
}

TEST_F(ShareSourceEnumerator, LetsNoSinkGoWhileItIsCalled) {
    CTally inside;
    CGate gate;
    CSourceSink sink([&](SHARE_SOURCE_EVENT, IShareSource*) {
        inside.Add();
        EXPECT_TRUE(gate.Passes());
    });
    enumerator.AddSink(&sink);
    IShareSource* const source = enumerator.Append(1);
    CCallOnThread event([&] { enumerator.OnShareSourceEvent(SHARE_SOURCE_EVENT_ADDED, source); });
    ASSERT_TRUE(inside.Reaches(1));
    CCallOnThread remove([&] { enumerator.RemoveSink(&sink); });
    remove.UntilItWaits();
    EXPECT_FALSE(remove.HasReturned());
    EXPECT_EQ(IdsOf(enumerator), (Ids{1}));
    gate.Open();
}

// ---- The end

TEST_F(ShareSourceEnumerator, DropsSourcesAndSinksOnCleanup) {
    CSourceSink sink;
    enumerator.AddSink(&sink);
    enumerator.Append(1);
    const CTraceLog trace;
    enumerator.Cleanup();
    EXPECT_EQ(trace.Lines(), (Lines{DebugLine("[CShareSourceEnumerator::Cleanup]"),
                                    DebugLine("[CShareSourceEnumerator::CleanShareSource]"),
                                    DebugLine("[CShareSourceEnumerator::CleanSink]")}));
    EXPECT_EQ(NumberOf(enumerator), 0);
    EXPECT_FALSE(enumerator.HasSourceObserver());
    EXPECT_EQ(COpenEnumerator::alive, 0);
}

TEST(CShareSourceEnumerator, CleansUpAtItsEnd) {
    CHeldSource held;
    CTraceLog trace;
    {
        COpenEnumerator enumerator;
        enumerator.Append(1);
        enumerator.Append(2);
        ASSERT_EQ(enumerator.GetSource(0, held.Out()), 0);
        trace.Clear();
    }
    EXPECT_EQ(trace.Lines(), (Lines{DebugLine("[CShareSourceEnumerator::Cleanup]"),
                                    DebugLine("[CShareSourceEnumerator::CleanShareSource]"),
                                    DebugLine("[CShareSourceEnumerator::CleanSink]")}));
    EXPECT_EQ(held->GetReference(), 1u);
    EXPECT_EQ(COpenEnumerator::alive, 1);
}

} // namespace
