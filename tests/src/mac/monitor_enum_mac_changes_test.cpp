// SPDX-License-Identifier: Apache-2.0
#include "src/mac/monitor_enum_mac.h"

#include "tests/src/mac/monitor_enum_mac_tools.h"
#include "tests/src/share_source_tools.h"
#include "tests/support/call_on_thread.h"
#include "tests/support/trace_log.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <utility>
#include <vector>

namespace {

/// An enumerator that doesn't watch, with a sink, called as the platform would call it.
class MonitorEnumMacChanges : public MonitorEnumMac {
protected:
    MonitorEnumMacChanges() {
        monitors.AddSink(&sink);
        monitors.Refresh();
    }
    ~MonitorEnumMacChanges() override { monitors.RemoveSink(&sink); }

    void Reconfigure(unsigned display, unsigned flags) {
        CMonitorEnumMac_DisplayReconfigCallBack(display, flags, &monitors);
    }

    CSourceSink sink;
    CMonitorEnumMac monitors{false};
};

// ---- Flags

TEST(DisplayReconfigFlags, AreSpelledInAnOrderOfTheirOwn) {
    EXPECT_EQ(DisplayReconfigCallBackFlagsToString(0), "");
    EXPECT_EQ(DisplayReconfigCallBackFlagsToString(0x11), "|Add|Begin");
    EXPECT_EQ(DisplayReconfigCallBackFlagsToString(0xFFFFFFFF),
              "|Add|Remove|Begin|Moved|SetMain|SetMode|Enabled|Disabled|Mirror|UnMirror|ShapeChanged");
}

TEST(DisplayReconfigFlags, HaveAWordEach) {
    const std::vector<std::pair<unsigned, std::string>> words = {
        {0x1, "|Begin"},
        {0x2, "|Moved"},
        {0x4, "|SetMain"},
        {0x8, "|SetMode"},
        {0x10, "|Add"},
        {0x20, "|Remove"},
        {0x40, ""},
        {0x80, ""},
        {0x100, "|Enabled"},
        {0x200, "|Disabled"},
        {0x400, "|Mirror"},
        {0x800, "|UnMirror"},
        {0x1000, "|ShapeChanged"},
        {0x2000, ""},
    };
    for (const auto& [flag, word] : words)
        EXPECT_EQ(DisplayReconfigCallBackFlagsToString(flag), word) << flag;
}

// ---- Changes

TEST_F(MonitorEnumMacChanges, AreNothingToNobody) {
    const CTraceLog trace;
    CMonitorEnumMac_DisplayReconfigCallBack(kMain, kAdd, nullptr);
    EXPECT_TRUE(trace.Lines().empty());
}

TEST_F(MonitorEnumMacChanges, AreTracedWithTheirAction) {
    CTraceLog trace(CM_TRACE_INFO);
    const std::vector<std::pair<unsigned, std::string>> actions = {
        {0x11, "add flags=0x11 details=|Add|Begin"},
        {0x30, "add flags=0x30 details=|Add|Remove"},
        {0x20, "remove flags=0x20 details=|Remove"},
        {0x8, "update flags=0x8 details=|SetMode"},
        {0, "update flags=0x0 details="},
        {0xABCDE000, "update flags=0xabcde000 details="},
    };
    for (const auto& [flags, text] : actions) {
        trace.Clear();
        Reconfigure(kAbsent, flags);
        EXPECT_EQ(trace.Lines().front(),
                  InfoLine("[ShareCapturerTovel_DisplayReconfigCallBack] displayid=99 action=" + text));
    }
}

TEST_F(MonitorEnumMacChanges, AddADisplayAndTell) {
    server->SetDisplays({MainDisplay(), SideDisplay(), FakeDisplay(8, {{0, 900}, {640, 480}})});
    const CTraceLog trace;
    Reconfigure(8, 0x11);
    EXPECT_EQ(trace.Lines(),
              (Lines{InfoLine("[ShareCapturerTovel_DisplayReconfigCallBack] displayid=8 action=add "
                              "flags=0x11 details=|Add|Begin"),
                     DebugLine("[CMonitorEnumMac::AddOneMonitor] displayid=8"),
                     DebugLine("[CShareSource::SetInfo]>>sourceId=8"),
                     InfoLine("[CShareSourceEnumerator::OnShareSourceEvent] event=08")}));
    EXPECT_EQ(sink.Told(), (Told{{SHARE_SOURCE_EVENT_ADDED, 8}}));
    EXPECT_EQ(IdsOf(monitors), (Ids{kMain, kSide, 8}));
}

TEST_F(MonitorEnumMacChanges, RemoveADisplayAndTell) {
    const CTraceLog trace;
    Reconfigure(kMain, kRemove);
    EXPECT_EQ(trace.Lines(),
              (Lines{InfoLine("[ShareCapturerTovel_DisplayReconfigCallBack] displayid=1 action=remove "
                              "flags=0x20 details=|Remove"),
                     InfoLine("[CShareSourceEnumerator::OnShareSourceEvent] event=11")}));
    EXPECT_EQ(sink.Told(), (Told{{SHARE_SOURCE_EVENT_REMOVED, kMain}}));
    EXPECT_EQ(IdsOf(monitors), (Ids{kSide}));
}

TEST_F(MonitorEnumMacChanges, TellNothingOfTheRemovalOfAnUnknownDisplay) {
    Reconfigure(kAbsent, kRemove);
    EXPECT_TRUE(sink.Told().empty());
    EXPECT_EQ(IdsOf(monitors), (Ids{kMain, kSide}));
}

TEST_F(MonitorEnumMacChanges, EndASourceThatWasRemovedAndThatNobodyHolds) {
    CHeldSource held;
    ASSERT_EQ(monitors.GetSourceBySourceId(kSide, held.Out()), 0);
    Reconfigure(kSide, kRemove);
    EXPECT_EQ(held->GetReference(), 1u);
}

TEST_F(MonitorEnumMacChanges, AddAndRemoveInOneCall) {
    Reconfigure(kAbsent, kAdd | kRemove);
    EXPECT_EQ(sink.Told(),
              (Told{{SHARE_SOURCE_EVENT_ADDED, kAbsent}, {SHARE_SOURCE_EVENT_REMOVED, kAbsent}}));
    EXPECT_EQ(IdsOf(monitors), (Ids{kMain, kSide}));
}

TEST_F(MonitorEnumMacChanges, AddAndUpdateInOneCall) {
    server->SetDisplays({MainDisplay(), SideDisplay(), FakeDisplay(8, {{0, 900}, {640, 480}})});
    Reconfigure(8, kAdd | kMoved);
    EXPECT_EQ(sink.Told(), (Told{{SHARE_SOURCE_EVENT_ADDED, 8}, {SHARE_SOURCE_EVENT_UPDATED, 8}}));
    EXPECT_EQ(IdsOf(monitors), (Ids{kMain, kSide, 8}));
}

TEST_F(MonitorEnumMacChanges, UpdateOnceForEachOfTheThreeFlagsAndForAllOfThem) {
    for (const unsigned flags : {0x2u, 0x4u, 0x1000u, 0x1002u, 0x1006u}) {
        const std::size_t before = sink.Told().size();
        Reconfigure(kMain, flags);
        ASSERT_EQ(sink.Told().size(), before + 1) << flags;
        EXPECT_EQ(sink.Told().back(), (SourceEvent{SHARE_SOURCE_EVENT_UPDATED, kMain}));
    }
}

TEST_F(MonitorEnumMacChanges, TellNothingOfOtherFlags) {
    Reconfigure(kMain, 0x1 | 0x8 | 0x100 | 0x200 | 0x400 | 0x800);
    EXPECT_TRUE(sink.Told().empty());
    EXPECT_EQ(IdsOf(monitors), (Ids{kMain, kSide}));
}

TEST_F(MonitorEnumMacChanges, MakeTheListAnewOnAnUpdate) {
    CHeldSource before;
    ASSERT_EQ(monitors.GetSourceBySourceId(kMain, before.Out()), 0);
    server->SetDisplays({FakeDisplay(kMain, {{5, 5}, {10, 10}}, 1.0F, "Main panel")});
    const CTraceLog trace;
    monitors.OnDisplayUpdated(kMain);
    EXPECT_EQ(trace.Lines(), (Lines{DebugLine("[CMonitorEnumMac::Refresh]"),
                                    DebugLine("[CShareSourceEnumerator::CleanShareSource]"),
                                    DebugLine("[CMonitorEnumMac::AddOneMonitor] displayid=1"),
                                    DebugLine("[CShareSource::SetInfo]>>sourceId=1"),
                                    DebugLine("[CMonitorEnumMac::EnumMonitors] count=1"),
                                    InfoLine("[CShareSourceEnumerator::OnShareSourceEvent] event=21")}));
    EXPECT_EQ(IdsOf(monitors), (Ids{kMain}));
    EXPECT_EQ(before->GetSourceRect(false), (TVLRect{0, 0, 1440, 900}));
    CHeldSource after;
    ASSERT_EQ(monitors.GetSource(0, after.Out()), 0);
    EXPECT_EQ(after->GetSourceRect(false), (TVLRect{5, 5, 15, 15}));
}

TEST_F(MonitorEnumMacChanges, MakeTheListAnewOnAnUpdateOfAnUnknownDisplayAndTellNothing) {
    server->SetDisplays({SideDisplay()});
    Reconfigure(kAbsent, kMoved);
    EXPECT_TRUE(sink.Told().empty());
    EXPECT_EQ(IdsOf(monitors), (Ids{kSide}));
}

TEST_F(MonitorEnumMac, KeepsAReferenceOnWhatWasUpdatedUntilItsEnd) {
    CHeldSource updated;
    unsigned during = 0;
    CSourceSink sink([&](SHARE_SOURCE_EVENT, IShareSource* source) { during = source->GetReference(); });
    {
        CMonitorEnumMac monitors(false);
        monitors.AddSink(&sink);
        monitors.OnDisplayUpdated(kSide);
        EXPECT_EQ(during, 2u);
        ASSERT_EQ(monitors.GetSourceBySourceId(kSide, updated.Out()), 0);
        monitors.Cleanup();
        EXPECT_EQ(updated->GetReference(), 2u);
    }
    EXPECT_EQ(updated->GetReference(), 1u);
}

TEST_F(MonitorEnumMac, KeepsTheSourceOfAnEventWhileTheSinkRefreshesTheList) {
    CMonitorEnumMac monitors(false);
    std::vector<unsigned long> read;
    CSourceSink sink([&](SHARE_SOURCE_EVENT, IShareSource* source) {
        monitors.Refresh();
        read.push_back(source->GetSourceUniqueId());
    });
    monitors.AddSink(&sink);
    monitors.OnDisplayPlugin(kSide);
    monitors.OnDisplayUpdated(kSide);
    monitors.OnDisplayPlugout(kSide);
    EXPECT_EQ(read, (Ids{kSide, kSide, kSide}));
}

TEST_F(MonitorEnumMac, ListsNoDisplayTwiceWhenTwoThreadsRefreshAtOnce) {
    CMonitorEnumMac monitors(false);
    {
        CTraceStop enumerating("[CMonitorEnumMac::AddOneMonitor] displayid=1");
        CCallOnThread first([&] { monitors.Refresh(); });
        ASSERT_TRUE(enumerating.Holds(1));
        CCallOnThread second([&] { monitors.Refresh(); });
        second.UntilItWaits();
        enumerating.Open();
    }
    EXPECT_EQ(IdsOf(monitors), (Ids{kMain, kSide}));
}

TEST_F(MonitorEnumMac, ListsNoDisplayThatWasRemovedDuringARefresh) {
    CMonitorEnumMac monitors(false);
    CSourceSink sink;
    monitors.AddSink(&sink);
    {
        CTraceStop enumerating("[CMonitorEnumMac::AddOneMonitor] displayid=1");
        CCallOnThread refresh([&] { monitors.Refresh(); });
        ASSERT_TRUE(enumerating.Holds(1));
        CCallOnThread remove([&] { monitors.OnDisplayPlugout(kSide); });
        remove.UntilItWaits();
        EXPECT_FALSE(remove.HasReturned());
        enumerating.Open();
    }
    EXPECT_EQ(sink.Told(), (Told{{SHARE_SOURCE_EVENT_REMOVED, kSide}}));
    EXPECT_EQ(IdsOf(monitors), (Ids{kMain}));
}

// ---- Watching

TEST_F(MonitorEnumMac, HearsOfChangesWhileItWatches) {
    CSourceSink sink;
    CMonitorEnumMac monitors(true);
    monitors.AddSink(&sink);
    monitors.Refresh();
    server->SetDisplays({MainDisplay()});
    server->RaiseDisplayChanged(kSide, kRemove);
    server->RaiseDisplayChanged(kMain, kMoved);
    ASSERT_TRUE(sink.WasTold(2));
    EXPECT_EQ(sink.Told(), (Told{{SHARE_SOURCE_EVENT_REMOVED, kSide}, {SHARE_SOURCE_EVENT_UPDATED, kMain}}));
}

TEST_F(MonitorEnumMac, HearsOfNothingWhenItDoesNotWatch) {
    CSourceSink deaf;
    CMonitorEnumMac still(false);
    still.AddSink(&deaf);
    still.Refresh();
    CSourceSink sink;
    CMonitorEnumMac watching(true);
    watching.AddSink(&sink);
    server->RaiseDisplayChanged(kSide, kAdd);
    ASSERT_TRUE(sink.WasTold(1));
    EXPECT_TRUE(deaf.Told().empty());
    EXPECT_EQ(IdsOf(still), (Ids{kMain, kSide}));
}

TEST_F(MonitorEnumMac, LosesAllItsDisplaysWithTheWindowServer) {
    CSourceSink sink;
    CMonitorEnumMac monitors(true);
    monitors.AddSink(&sink);
    monitors.Refresh();
    server->SetLife(platform::Life::Lost);
    server->RaiseDisplayChanged(kMain, kRemove);
    server->RaiseDisplayChanged(kSide, kRemove);
    ASSERT_TRUE(sink.WasTold(2));
    EXPECT_EQ(NumberOf(monitors), 0);
    server->SetLife(platform::Life::Alive);
    server->RaiseDisplayChanged(kMain, kAdd);
    ASSERT_TRUE(sink.WasTold(3));
    EXPECT_EQ(IdsOf(monitors), (Ids{kMain}));
}

TEST_F(MonitorEnumMac, WaitsAtItsEndForAnEventThatRuns) {
    CTally inside;
    CGate gate;
    CSourceSink sink([&](SHARE_SOURCE_EVENT, IShareSource*) {
        inside.Add();
        EXPECT_TRUE(gate.Passes());
    });
    auto monitors = std::make_unique<CMonitorEnumMac>(true);
    monitors->AddSink(&sink);
    server->RaiseDisplayChanged(kSide, kAdd);
    ASSERT_TRUE(inside.Reaches(1));
    CCallOnThread end([&] { monitors.reset(); });
    end.UntilItWaits();
    EXPECT_FALSE(end.HasReturned());
    gate.Open();
}

TEST_F(MonitorEnumMac, EndsWhileAnEventOfAnotherOneRuns) {
    CTally inside;
    CGate gate;
    CSourceSink sink([&](SHARE_SOURCE_EVENT, IShareSource*) {
        inside.Add();
        EXPECT_TRUE(gate.Passes());
    });
    CMonitorEnumMac monitors(true);
    monitors.AddSink(&sink);
    auto passing = std::make_unique<CMonitorEnumMac>(true);
    server->RaiseDisplayChanged(kSide, kAdd);
    ASSERT_TRUE(inside.Reaches(1));
    passing.reset();
    gate.Open();
}

TEST_F(MonitorEnumMac, CanBeMadeAndEndedInsideAnEvent) {
    CTally done;
    CSourceSink sink([&](SHARE_SOURCE_EVENT, IShareSource*) {
        CMonitorEnumMac inner(true);
        inner.Refresh();
        EXPECT_EQ(NumberOf(inner), 2);
        done.Add();
    });
    CMonitorEnumMac monitors(true);
    monitors.AddSink(&sink);
    server->RaiseDisplayChanged(kSide, kAdd);
    EXPECT_TRUE(done.Reaches(1));
    monitors.RemoveSink(&sink);
}

} // namespace
