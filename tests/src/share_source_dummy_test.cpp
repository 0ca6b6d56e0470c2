// SPDX-License-Identifier: Apache-2.0
#include "src/share_source_dummy.h"

#include "tests/src/share_source_tools.h"
#include "tests/support/trace_log.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <type_traits>
#include <vector>

namespace {

using Ids = std::vector<unsigned long>;

TEST(CShareSourceEnumeratorDummy, HasFiveSourcesFromTheBeginning) {
    CShareSourceEnumeratorDummyApp dummy;
    EXPECT_EQ(NumberOf(dummy), 5);
    EXPECT_EQ(IdsOf(dummy), (Ids{0, 1, 2, 3, 4}));
}

TEST(CShareSourceEnumeratorDummy, KeepsItsSourcesOverARefresh) {
    CShareSourceEnumeratorDummyDesktop dummy;
    CHeldSource before;
    ASSERT_EQ(dummy.GetSource(0, before.Out()), 0);
    const CTraceLog trace;
    dummy.Refresh();
    EXPECT_TRUE(trace.Lines().empty());
    EXPECT_EQ(NumberOf(dummy), 5);
    CHeldSource after;
    ASSERT_EQ(dummy.GetSource(0, after.Out()), 0);
    EXPECT_EQ(after.Get(), before.Get());
}

TEST(CShareSourceEnumeratorDummy, FindsTheSourcesThatThereAre) {
    CShareSourceEnumeratorDummyApp dummy;
    CHeldSource byId;
    EXPECT_EQ(dummy.GetSourceBySourceId(3, byId.Out()), 0);
    CHeldSource byIndex;
    EXPECT_EQ(dummy.GetSource(3, byIndex.Out()), 0);
    EXPECT_EQ(byId.Get(), byIndex.Get());
    CHeldSource none;
    EXPECT_EQ(dummy.GetSourceBySourceId(5, none.Out()), -1);
    EXPECT_EQ(dummy.GetSource(5, none.Out()), -1);
    EXPECT_EQ(none.Get(), nullptr);
}

TEST(CShareSourceEnumeratorDummy, GivesItsTypeToEachSource) {
    CShareSourceEnumeratorDummyApp applications;
    CShareSourceEnumeratorDummyDesktop monitors;
    for (int index = 0; index < 5; ++index) {
        CHeldSource application;
        ASSERT_EQ(applications.GetSource(index, application.Out()), 0);
        EXPECT_EQ(application->GetSourceType(), SHARE_SOURCE_TYPE_APP);
        CHeldSource monitor;
        ASSERT_EQ(monitors.GetSource(index, monitor.Out()), 0);
        EXPECT_EQ(monitor->GetSourceType(), SHARE_SOURCE_TYPE_MONITOR);
    }
}

TEST(CShareSourceEnumeratorDummy, HasNoEnumeratorTypeOfItsOwn) {
    EXPECT_EQ(CShareSourceEnumeratorDummyApp().GetShareSourceEnumeratorType(), 0);
    EXPECT_EQ(CShareSourceEnumeratorDummyDesktop().GetShareSourceEnumeratorType(), 0);
}

TEST(CShareSourceEnumeratorDummy, GivesSourcesThatKnowNothing) {
    CShareSourceEnumeratorDummyDesktop dummy;
    for (int index = 0; index < 5; ++index) {
        CHeldSource source;
        ASSERT_EQ(dummy.GetSource(index, source.Out()), 0);
        EXPECT_NE(dynamic_cast<CShareSourceDummy*>(source.Get()), nullptr);
        EXPECT_EQ(source->GetSourceRect(false), (TVLRect{0, 0, 0, 0}));
        EXPECT_EQ(source->GetSourceRect(true), (TVLRect{0, 0, 0, 0}));
        EXPECT_FALSE(source->IsShared());
        char out[8] = "kept";
        EXPECT_EQ(source->GetName(out, 7), -1);
        EXPECT_EQ(source->GetDeviceId(out, 7), -1);
        EXPECT_STREQ(out, "kept");
    }
}

TEST(CShareSourceEnumeratorDummy, HoldsOneReferenceOnEachSource) {
    CHeldSource source;
    {
        CShareSourceEnumeratorDummyApp dummy;
        ASSERT_EQ(dummy.GetSource(2, source.Out()), 0);
        EXPECT_EQ(source->GetReference(), 2u);
    }
    EXPECT_EQ(source->GetReference(), 1u);
    EXPECT_EQ(source->GetSourceUniqueId(), 2u);
}

TEST(CShareSourceEnumeratorDummy, TracesTheMakingOfItsList) {
    const CTraceLog trace;
    const CShareSourceEnumeratorDummyApp dummy;
    std::vector<std::string> expected{DebugLine("[CShareSourceEnumerator::CleanShareSource]")};
    for (int id = 0; id < 5; ++id)
        expected.push_back(DebugLine("[CShareSource::SetInfo]>>sourceId=" + std::to_string(id)));
    EXPECT_EQ(trace.Lines(), expected);
}

TEST(CShareSourceEnumeratorDummy, TellsWhatAClientTellsItAndNothingElse) {
    CShareSourceEnumeratorDummyApp dummy;
    CSourceSink sink;
    ASSERT_EQ(dummy.AddSink(&sink), 0);
    dummy.Refresh();
    CHeldSource source;
    EXPECT_TRUE(dummy.RemoveSourceById(4, source.Out()));
    EXPECT_TRUE(sink.Told().empty());
    EXPECT_EQ(dummy.OnShareSourceEvent(SHARE_SOURCE_EVENT_REMOVED, source.Get()), 0);
    EXPECT_EQ(sink.Told(), (std::vector<SourceEvent>{{SHARE_SOURCE_EVENT_REMOVED, 4}}));
    dummy.RemoveSink(&sink);
}

TEST(CShareSourceEnumeratorDummy, CanBeToldApartByItsClass) {
    static_assert(std::is_base_of_v<CShareSourceEnumeratorDummy, CShareSourceEnumeratorDummyApp>);
    static_assert(std::is_base_of_v<CShareSourceEnumeratorDummy, CShareSourceEnumeratorDummyDesktop>);
    const std::unique_ptr<IShareSourceEnumerator> dummy =
        std::make_unique<CShareSourceEnumeratorDummyDesktop>();
    EXPECT_NE(dynamic_cast<CShareSourceEnumeratorDummyDesktop*>(dummy.get()), nullptr);
    EXPECT_EQ(dynamic_cast<CShareSourceEnumeratorDummyApp*>(dummy.get()), nullptr);
}

} // namespace
