// SPDX-License-Identifier: Apache-2.0
#include "src/mac/monitor_enum_mac.h"

#include "tests/src/mac/monitor_enum_mac_tools.h"
#include "tests/src/share_source_tools.h"
#include "tests/support/trace_log.h"
#include "util/cm_trace.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace {

// ---- The list

TEST_F(MonitorEnumMac, StartsEmptyAndOfTheMonitorsType) {
    CMonitorEnumMac monitors(true);
    EXPECT_EQ(NumberOf(monitors), 0);
    EXPECT_EQ(monitors.GetShareSourceEnumeratorType(), 2);
}

TEST_F(MonitorEnumMac, ListsTheOnlineDisplaysInTheirOrder) {
    CMonitorEnumMac monitors(false);
    CTraceLog trace;
    monitors.Refresh();
    EXPECT_EQ(trace.Lines(), (Lines{DebugLine("[CMonitorEnumMac::Refresh]"),
                                    DebugLine("[CShareSourceEnumerator::CleanShareSource]"),
                                    DebugLine("[CMonitorEnumMac::AddOneMonitor] displayid=1"),
                                    DebugLine("[CShareSource::SetInfo]>>sourceId=1"),
                                    DebugLine("[CMonitorEnumMac::AddOneMonitor] displayid=7"),
                                    DebugLine("[CShareSource::SetInfo]>>sourceId=7"),
                                    DebugLine("[CMonitorEnumMac::EnumMonitors] count=2")}));
    EXPECT_EQ(IdsOf(monitors), (Ids{kMain, kSide}));
}

TEST_F(MonitorEnumMac, ListsNoMonitorBeforeItIsKnownWhatItIs) {
    struct Seen {
        CMonitorEnumMac monitors{false};
        std::vector<int> listed;
    } seen;
    const CTraceLog threshold(CM_TRACE_DEBUG);
    CmSetTraceReceiver(
        [](void* to, int, const char*, const char* text, int length) {
            auto& into = *static_cast<Seen*>(to);
            const std::string_view line(text, static_cast<std::size_t>(length));
            if (line.find("[CShareSource::SetInfo]") != std::string_view::npos)
                into.listed.push_back(NumberOf(into.monitors));
        },
        &seen);
    seen.monitors.Refresh();
    CmSetTraceReceiver(nullptr, nullptr);
    EXPECT_EQ(seen.listed, (std::vector<int>{0, 1}));
}

TEST_F(MonitorEnumMac, GivesAMonitorItsPlaceAndScale) {
    CMonitorEnumMac monitors(false);
    monitors.Refresh();
    CHeldSource side;
    ASSERT_EQ(monitors.GetSourceBySourceId(kSide, side.Out()), 0);
    EXPECT_EQ(side->GetSourceType(), SHARE_SOURCE_TYPE_MONITOR);
    EXPECT_FALSE(side->IsShared());
    EXPECT_EQ(side->GetSourceRect(false), (TVLRect{1440, 0, 2720, 800}));
    EXPECT_EQ(side->GetSourceRect(true), (TVLRect{2880, 0, 2560, 1600}));
    EXPECT_EQ(side->GetReference(), 2u);
}

TEST_F(MonitorEnumMac, CutsTheEdgesOfAMonitorToWholePoints) {
    server->SetDisplays({FakeDisplay(kMain, {{-10.7F, 3.9F}, {100.6F, 50.2F}})});
    EXPECT_EQ(CMonitorEnumMac::screenUIRectForDisplayID(kMain), (TVLRect{-10, 3, 90, 53}));
}

TEST_F(MonitorEnumMac, LooksTheNameOfAMonitorUpWhenItIsAskedFor) {
    CMonitorEnumMac monitors(false);
    monitors.Refresh();
    server->SetDisplays({FakeDisplay(kMain, {}, 1.0F, "Renamed")});
    CHeldSource source;
    ASSERT_EQ(monitors.GetSource(0, source.Out()), 0);
    char name[33];
    EXPECT_EQ(source->GetName(name, 32), 0);
    EXPECT_STREQ(name, "Renamed");
    CHeldSource gone;
    ASSERT_EQ(monitors.GetSource(1, gone.Out()), 0);
    EXPECT_EQ(gone->GetName(name, 32), -1);
}

TEST_F(MonitorEnumMac, ListsAnewOnEachRefresh) {
    CMonitorEnumMac monitors(false);
    monitors.Refresh();
    CHeldSource before;
    ASSERT_EQ(monitors.GetSourceBySourceId(kSide, before.Out()), 0);
    server->SetDisplays({FakeDisplay(kSide, {{0, 0}, {10, 10}})});
    monitors.Refresh();
    EXPECT_EQ(IdsOf(monitors), (Ids{kSide}));
    CHeldSource after;
    ASSERT_EQ(monitors.GetSource(0, after.Out()), 0);
    EXPECT_NE(after.Get(), before.Get());
    EXPECT_EQ(before->GetReference(), 1u);
    EXPECT_EQ(before->GetSourceRect(false), (TVLRect{1440, 0, 2720, 800}));
}

TEST_F(MonitorEnumMac, SaysSoWhenThereIsNoDisplayAndLeavesTheList) {
    CMonitorEnumMac monitors(false);
    monitors.Refresh();
    server->SetDisplays({});
    CTraceLog trace;
    EXPECT_EQ(monitors.EnumMonitors(), -1);
    EXPECT_EQ(trace.Lines(), (Lines{DebugLine("[CMonitorEnumMac::EnumMonitors] count=0")}));
    EXPECT_EQ(NumberOf(monitors), 2);
    server->SetLife(platform::Life::Lost);
    EXPECT_EQ(monitors.EnumMonitors(), -1);
    EXPECT_EQ(NumberOf(monitors), 2);
}

TEST_F(MonitorEnumMac, IsEmptyAfterARefreshWithoutDisplays) {
    CMonitorEnumMac monitors(false);
    monitors.Refresh();
    server->SetLife(platform::Life::Lost);
    monitors.Refresh();
    EXPECT_EQ(NumberOf(monitors), 0);
}

TEST_F(MonitorEnumMac, AppendsToWhatIsThereWhenItOnlyEnumerates) {
    CMonitorEnumMac monitors(false);
    EXPECT_EQ(monitors.EnumMonitors(), 0);
    EXPECT_EQ(monitors.EnumMonitors(), 0);
    EXPECT_EQ(IdsOf(monitors), (Ids{kMain, kSide, kMain, kSide}));
}

TEST_F(MonitorEnumMac, ListsNoMoreThanSixtyFourDisplays) {
    platform::DisplayList displays;
    for (unsigned id = 1; id <= 70; ++id)
        displays.push_back(FakeDisplay(id, {{0, 0}, {10, 10}}));
    server->SetDisplays(displays);
    CMonitorEnumMac monitors(false);
    const CTraceLog trace;
    monitors.Refresh();
    EXPECT_EQ(NumberOf(monitors), 64);
    EXPECT_EQ(IdsOf(monitors).back(), 64u);
    EXPECT_EQ(trace.LinesContaining("EnumMonitors"),
              (Lines{DebugLine("[CMonitorEnumMac::EnumMonitors] count=64")}));
}

TEST_F(MonitorEnumMac, SendsNoEventsOnARefresh) {
    CMonitorEnumMac monitors(true);
    CSourceSink sink;
    monitors.AddSink(&sink);
    monitors.Refresh();
    server->SetDisplays({});
    monitors.Refresh();
    EXPECT_TRUE(sink.Told().empty());
    monitors.RemoveSink(&sink);
}

TEST_F(MonitorEnumMac, AddsAMonitorWithTheNameThatItIsGiven) {
    CMonitorEnumMac monitors(false);
    IShareSource* const source = monitors.AddOneMonitor(kSide, "given");
    EXPECT_EQ(source->GetReference(), 1u);
    char name[301];
    EXPECT_EQ(source->GetName(name, 300), 0);
    EXPECT_STREQ(name, "given");
    const std::string text(300, 'n');
    EXPECT_EQ(monitors.AddOneMonitor(kSide, text.c_str())->GetName(name, 300), 0);
    EXPECT_EQ(std::string(name), text.substr(0, 255));
    EXPECT_EQ(IdsOf(monitors), (Ids{kSide, kSide}));
}

TEST_F(MonitorEnumMac, AddsAMonitorWithoutANameThatLooksItUp) {
    CMonitorEnumMac monitors(false);
    char name[33];
    EXPECT_EQ(monitors.AddOneMonitor(kSide, "")->GetName(name, 32), 0);
    EXPECT_STREQ(name, "Side panel");
    EXPECT_EQ(monitors.AddOneMonitor(kMain, nullptr)->GetName(name, 32), 0);
    EXPECT_STREQ(name, "Main panel");
}

TEST_F(MonitorEnumMac, AddsADisplayThatIsNotThereAsNothing) {
    CMonitorEnumMac monitors(false);
    IShareSource* const source = monitors.AddOneMonitor(kAbsent, "");
    EXPECT_EQ(source->GetSourceRect(true), (TVLRect{0, 0, 0, 0}));
    char name[33];
    EXPECT_EQ(source->GetName(name, 32), -1);
}

// ---- Displays

TEST_F(MonitorEnumMac, FindsTheScreenOfADisplay) {
    const std::optional<platform::NSScreen> screen = CMonitorEnumMac::screenForDisplayID(kSide);
    ASSERT_TRUE(screen.has_value());
    EXPECT_EQ(screen->deviceDescription().NSScreenNumber, kSide);
    EXPECT_FALSE(CMonitorEnumMac::screenForDisplayID(kAbsent).has_value());
    EXPECT_FALSE(CMonitorEnumMac::screenForDisplayID(0).has_value());
}

TEST_F(MonitorEnumMac, TellsNameAndScaleOfADisplay) {
    EXPECT_EQ(CMonitorEnumMac::screenNameForDisplayID(kSide), "Side panel");
    EXPECT_EQ(CMonitorEnumMac::screenNameForDisplayID(kAbsent), "");
    EXPECT_EQ(CMonitorEnumMac::screenScaleFactorForDisplayID(kSide), 2.0F);
    EXPECT_EQ(CMonitorEnumMac::screenScaleFactorForDisplayID(kAbsent), 1.0F);
}

TEST_F(MonitorEnumMac, TellsBothRectanglesOfADisplay) {
    EXPECT_EQ(CMonitorEnumMac::screenImageRectForDisplayID(kSide), (TVLRect{0, 0, 2560, 1600}));
    EXPECT_EQ(CMonitorEnumMac::screenUIRectForDisplayID(kSide), (TVLRect{1440, 0, 2720, 800}));
    EXPECT_EQ(CMonitorEnumMac::screenImageRectForDisplayID(kAbsent), (TVLRect{0, 0, 0, 0}));
    EXPECT_EQ(CMonitorEnumMac::screenUIRectForDisplayID(kAbsent), (TVLRect{0, 0, 0, 0}));
}

TEST_F(MonitorEnumMac, CutsTheImageRectangleToWholePixels) {
    server->SetDisplays({FakeDisplay(kMain, {{0, 0}, {1001, 333}}, 1.5F)});
    EXPECT_EQ(CMonitorEnumMac::screenImageRectForDisplayID(kMain), (TVLRect{0, 0, 1501, 499}));
}

TEST_F(MonitorEnumMac, TakesTheFirstDisplayForThePrimaryOne) {
    server->SetDisplays({SideDisplay(), MainDisplay()});
    EXPECT_EQ(CMonitorEnumMac::primaryScreenUIRectForDisplayID(), (TVLRect{1440, 0, 2720, 800}));
    EXPECT_EQ(CMonitorEnumMac::primaryScreenImageRectForDisplayID(), (TVLRect{0, 0, 2560, 1600}));
}

TEST_F(MonitorEnumMac, HasNothingToTellWithoutAWindowServer) {
    server->SetLife(platform::Life::Lost);
    EXPECT_EQ(CMonitorEnumMac::primaryScreenUIRectForDisplayID(), (TVLRect{0, 0, 0, 0}));
    EXPECT_EQ(CMonitorEnumMac::primaryScreenImageRectForDisplayID(), (TVLRect{0, 0, 0, 0}));
    EXPECT_EQ(CMonitorEnumMac::screenScaleFactorForDisplayID(kMain), 1.0F);
    EXPECT_EQ(CMonitorEnumMac::screenNameForDisplayID(kMain), "");
}

} // namespace
