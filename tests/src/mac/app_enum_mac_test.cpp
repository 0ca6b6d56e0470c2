// SPDX-License-Identifier: Apache-2.0
#include "src/mac/app_enum_mac.h"

#include "tests/src/share_source_tools.h"
#include "tests/support/call_on_thread.h"
#include "tests/support/fake_window_server.h"
#include "tests/support/trace_log.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

namespace {

using Ids = std::vector<unsigned long>;
using Lines = std::vector<std::string>;
using Told = std::vector<SourceEvent>;

constexpr pid_t kEditor = 100;
constexpr pid_t kBrowser = 200;
constexpr pid_t kAbsent = 999;

platform::ApplicationInfo Process(pid_t pid, std::string fileName, platform::ApplicationKind kind,
                                  bool backgroundOnly = false) {
    platform::ApplicationInfo application = FakeApplication(pid, std::move(fileName));
    application.kind = kind;
    application.backgroundOnly = backgroundOnly;
    return application;
}

platform::NSNotification NoticeOf(platform::NSNotificationName name, pid_t pid) {
    platform::NSNotification notification;
    notification.name = name;
    notification.userInfo.NSApplicationProcessIdentifier = pid;
    return notification;
}

class AppEnumMac : public testing::Test {
protected:
    AppEnumMac() {
        server->SetDisplays(
            {FakeDisplay(1, {{10, 20}, {1440, 900}}, 2.0F), FakeDisplay(7, {{1450, 20}, {640, 480}}, 1.0F)});
        server->SetApplications({FakeApplication(kEditor, "Editor"), FakeApplication(kBrowser, "Browser")});
    }

    /// What a refresh lists of those processes.
    Ids Listed(const platform::ApplicationList& processes) {
        server->SetApplications(processes);
        CAppEnumMac applications(false);
        applications.Refresh();
        return IdsOf(applications);
    }

    CFakeWindowServerScope server;
};

// ---- The list

TEST_F(AppEnumMac, StartsEmptyAndOfTheApplicationsType) {
    CAppEnumMac applications(true);
    EXPECT_EQ(NumberOf(applications), 0);
    EXPECT_EQ(applications.GetShareSourceEnumeratorType(), 1);
}

TEST_F(AppEnumMac, ListsTheRunningApplications) {
    CAppEnumMac applications(false);
    const CTraceLog trace;
    applications.Refresh();
    EXPECT_EQ(
        trace.Lines(),
        (Lines{
            DebugLine("[CAppEnumMac::Refresh]"), DebugLine("[CShareSourceEnumerator::CleanShareSource]"),
            DebugLine("[CAppEnumMac::AddOneApp] pid=100"), DebugLine("[CShareSource::SetInfo]>>sourceId=100"),
            DebugLine("[CAppEnumMac::AddOneApp] pid=200"), DebugLine("[CShareSource::SetInfo]>>sourceId=200"),
            InfoLine("[CAppEnumMac::EnumRunningApplications] count=2")}));
    EXPECT_EQ(IdsOf(applications), (Ids{kEditor, kBrowser}));
}

TEST_F(AppEnumMac, GivesEveryApplicationThePrimaryMonitorsPlaceAndScale) {
    CAppEnumMac applications(false);
    applications.Refresh();
    for (int index = 0; index < 2; ++index) {
        CHeldSource source;
        ASSERT_EQ(applications.GetSource(index, source.Out()), 0);
        EXPECT_EQ(source->GetSourceType(), SHARE_SOURCE_TYPE_APP);
        EXPECT_FALSE(source->IsShared());
        EXPECT_EQ(source->GetSourceRect(false), (TVLRect{10, 20, 1450, 920}));
        EXPECT_EQ(source->GetSourceRect(true), (TVLRect{20, 40, 2880, 1800}));
        EXPECT_EQ(source->GetReference(), 2u);
    }
}

TEST_F(AppEnumMac, LooksTheNameOfAnApplicationUpWhenItIsAskedFor) {
    CAppEnumMac applications(false);
    applications.Refresh();
    server->SetApplications({FakeApplication(kEditor, "Renamed")});
    CHeldSource editor;
    ASSERT_EQ(applications.GetSource(0, editor.Out()), 0);
    char name[33];
    EXPECT_EQ(editor->GetName(name, 32), 0);
    EXPECT_STREQ(name, "Renamed");
    CHeldSource gone;
    ASSERT_EQ(applications.GetSource(1, gone.Out()), 0);
    EXPECT_EQ(gone->GetName(name, 32), -1);
}

TEST_F(AppEnumMac, LeavesBackgroundOnlyProcessesOut) {
    using platform::ApplicationKind;
    EXPECT_EQ(Listed({Process(1, "agent", ApplicationKind::Ordinary, true),
                      Process(2, "tool", ApplicationKind::Ordinary),
                      Process(3, "java", ApplicationKind::Other, true)}),
              (Ids{2}));
}

TEST_F(AppEnumMac, ListsOfOtherProcessesThoseThatBearAJavaFileName) {
    using platform::ApplicationKind;
    EXPECT_EQ(
        Listed({Process(1, "helper", ApplicationKind::Other), Process(2, "java", ApplicationKind::Other),
                Process(3, "Java", ApplicationKind::Other), Process(4, "java2", ApplicationKind::Other),
                Process(5, "jav", ApplicationKind::Other), Process(6, "", ApplicationKind::Other)}),
        (Ids{2}));
}

TEST_F(AppEnumMac, IsEmptyWithoutAWindowServer) {
    CAppEnumMac applications(false);
    applications.Refresh();
    server->SetLife(platform::Life::Lost);
    EXPECT_EQ(applications.EnumRunningApplications(), 0);
    EXPECT_EQ(NumberOf(applications), 2);
    applications.Refresh();
    EXPECT_EQ(NumberOf(applications), 0);
}

TEST_F(AppEnumMac, CountsTheWholeListWhenItOnlyEnumerates) {
    CAppEnumMac applications(false);
    EXPECT_EQ(applications.EnumRunningApplications(), 0);
    const CTraceLog trace(CM_TRACE_INFO);
    EXPECT_EQ(applications.EnumRunningApplications(), 0);
    EXPECT_EQ(trace.Lines(), (Lines{InfoLine("[CAppEnumMac::EnumRunningApplications] count=4")}));
    EXPECT_EQ(IdsOf(applications), (Ids{kEditor, kBrowser, kEditor, kBrowser}));
}

TEST_F(AppEnumMac, ListsAnewOnEachRefresh) {
    CAppEnumMac applications(true);
    CSourceSink sink;
    applications.AddSink(&sink);
    applications.Refresh();
    CHeldSource before;
    ASSERT_EQ(applications.GetSource(0, before.Out()), 0);
    server->SetApplications({FakeApplication(kEditor, "Editor")});
    applications.Refresh();
    EXPECT_EQ(IdsOf(applications), (Ids{kEditor}));
    EXPECT_EQ(before->GetReference(), 1u);
    EXPECT_TRUE(sink.Told().empty());
    applications.RemoveSink(&sink);
}

TEST_F(AppEnumMac, KnowsThePrimaryMonitorsPlaceFromItsFirstLookOn) {
    CAppEnumMac applications(false);
    EXPECT_EQ(applications.AddOneApp(1)->GetSourceRect(false), (TVLRect{0, 0, 0, 0}));
    EXPECT_EQ(applications.GetPrimaryMonitorRect(), (TVLRect{10, 20, 1450, 920}));
    server->SetDisplays({});
    EXPECT_EQ(applications.AddOneApp(2)->GetSourceRect(false), (TVLRect{10, 20, 1450, 920}));
    EXPECT_EQ(applications.GetPrimaryMonitorRect(), (TVLRect{0, 0, 0, 0}));
}

TEST_F(AppEnumMac, GivesAnApplicationTheScaleOneWithoutADisplay) {
    CAppEnumMac applications(false);
    applications.GetPrimaryMonitorRect();
    server->SetDisplays({});
    EXPECT_EQ(applications.AddOneApp(1)->GetSourceRect(true), (TVLRect{10, 20, 1450, 920}));
}

TEST_F(AppEnumMac, AddsAndRemovesOneApplication) {
    CAppEnumMac applications(false);
    IShareSource* const added = applications.AddOneApp(kEditor);
    EXPECT_EQ(added->GetReference(), 1u);
    EXPECT_EQ(IdsOf(applications), (Ids{kEditor}));
    IShareSource* const removed = applications.RemoveOneApp(kEditor);
    EXPECT_EQ(removed, added);
    EXPECT_EQ(removed->GetReference(), 1u);
    removed->Release();
    EXPECT_EQ(applications.RemoveOneApp(kEditor), nullptr);
    EXPECT_EQ(NumberOf(applications), 0);
}

// ---- Events

TEST_F(AppEnumMac, TracesAnEventBeforeItsBaseDoes) {
    CAppEnumMac applications(false);
    IShareSource* const source = applications.AddOneApp(kEditor);
    CTraceLog trace;
    EXPECT_EQ(applications.OnShareSourceEvent(SHARE_SOURCE_EVENT_UPDATED, source), 0);
    EXPECT_EQ(trace.Lines(), (Lines{InfoLine("[CAppEnumMac::OnShareSourceEvent] event=2"),
                                    InfoLine("[CShareSourceEnumerator::OnShareSourceEvent] event=2100")}));
    trace.Clear();
    EXPECT_EQ(applications.OnShareSourceEvent(SHARE_SOURCE_EVENT_ADDED, nullptr), -1);
    EXPECT_EQ(trace.Lines(), (Lines{InfoLine("[CAppEnumMac::OnShareSourceEvent] event=0")}));
}

/// A wrapper that is called as the workspace would call it.
class AppNotificationWapperNotices : public AppEnumMac {
protected:
    AppNotificationWapperNotices() {
        applications.AddSink(&sink);
        applications.Refresh();
        notices.initWithAppEnum(&applications);
    }
    ~AppNotificationWapperNotices() override { applications.RemoveSink(&sink); }

    CSourceSink sink;
    CAppEnumMac applications{false};
    AppNotificationWapper notices;
};

TEST_F(AppNotificationWapperNotices, AddAnApplicationAndTell) {
    const CTraceLog trace;
    notices.appStarted(NoticeOf(platform::NSWorkspaceDidLaunchApplicationNotification, 300));
    EXPECT_EQ(trace.Lines(), (Lines{DebugLine("NSWorkspaceDidLaunchApplicationNotification "
                                              "{NSApplicationProcessIdentifier=300}"),
                                    DebugLine("[CAppEnumMac::AddOneApp] pid=300"),
                                    DebugLine("[CShareSource::SetInfo]>>sourceId=300"),
                                    InfoLine("[CAppEnumMac::OnShareSourceEvent] event=0"),
                                    InfoLine("[CShareSourceEnumerator::OnShareSourceEvent] event=0300")}));
    EXPECT_EQ(sink.Told(), (Told{{SHARE_SOURCE_EVENT_ADDED, 300}}));
    EXPECT_EQ(IdsOf(applications), (Ids{kEditor, kBrowser, 300}));
}

TEST_F(AppNotificationWapperNotices, AddWhatARefreshWouldHaveLeftOut) {
    server->SetApplications({Process(300, "agent", platform::ApplicationKind::Other, true)});
    notices.appStarted(NoticeOf(platform::NSWorkspaceDidLaunchApplicationNotification, 300));
    EXPECT_EQ(IdsOf(applications), (Ids{kEditor, kBrowser, 300}));
}

TEST_F(AppNotificationWapperNotices, RemoveAnApplicationAndTell) {
    CHeldSource editor;
    ASSERT_EQ(applications.GetSource(0, editor.Out()), 0);
    const CTraceLog trace;
    notices.appTerminated(NoticeOf(platform::NSWorkspaceDidTerminateApplicationNotification, kEditor));
    EXPECT_EQ(trace.Lines(), (Lines{DebugLine("NSWorkspaceDidTerminateApplicationNotification "
                                              "{NSApplicationProcessIdentifier=100}"),
                                    InfoLine("[CAppEnumMac::OnShareSourceEvent] event=1"),
                                    InfoLine("[CShareSourceEnumerator::OnShareSourceEvent] event=1100")}));
    EXPECT_EQ(sink.Told(), (Told{{SHARE_SOURCE_EVENT_REMOVED, kEditor}}));
    EXPECT_EQ(IdsOf(applications), (Ids{kBrowser}));
    EXPECT_EQ(editor->GetReference(), 1u);
}

TEST_F(AppNotificationWapperNotices, TellNothingOfTheEndOfAnUnknownProcess) {
    const CTraceLog trace;
    notices.appTerminated(NoticeOf(platform::NSWorkspaceDidTerminateApplicationNotification, kAbsent));
    EXPECT_EQ(trace.Lines(), (Lines{DebugLine("NSWorkspaceDidTerminateApplicationNotification "
                                              "{NSApplicationProcessIdentifier=999}"),
                                    InfoLine("[CAppEnumMac::OnShareSourceEvent] event=1")}));
    EXPECT_TRUE(sink.Told().empty());
    EXPECT_EQ(IdsOf(applications), (Ids{kEditor, kBrowser}));
}

TEST(AppNotificationWapper, DoesNoMoreThanTraceWithoutAnEnumerator) {
    AppNotificationWapper notices;
    const CTraceLog trace;
    notices.appStarted(NoticeOf(platform::NSWorkspaceDidLaunchApplicationNotification, 1));
    notices.appTerminated(NoticeOf(platform::NSWorkspaceDidTerminateApplicationNotification, 1));
    EXPECT_EQ(trace.Lines().size(), 2u);
}

TEST_F(AppEnumMac, KeepsTheSourceOfAnEventWhileTheSinkRefreshesTheList) {
    std::vector<unsigned long> read;
    CAppEnumMac applications(false);
    CSourceSink sink([&](SHARE_SOURCE_EVENT, IShareSource* source) {
        applications.Refresh();
        read.push_back(source->GetSourceUniqueId());
    });
    applications.AddSink(&sink);
    applications.Refresh();
    AppNotificationWapper notices;
    notices.initWithAppEnum(&applications);
    notices.appStarted(NoticeOf(platform::NSWorkspaceDidLaunchApplicationNotification, 300));
    notices.appTerminated(NoticeOf(platform::NSWorkspaceDidTerminateApplicationNotification, kEditor));
    EXPECT_EQ(read, (Ids{300, kEditor}));
}

TEST_F(AppNotificationWapperNotices, TakeOffAnApplicationThatEndsDuringARefresh) {
    {
        CTraceStop enumerating("[CAppEnumMac::AddOneApp] pid=100");
        CCallOnThread refresh([&] { applications.Refresh(); });
        ASSERT_TRUE(enumerating.Holds(1));
        CCallOnThread end([&] {
            notices.appTerminated(
                NoticeOf(platform::NSWorkspaceDidTerminateApplicationNotification, kEditor));
        });
        end.UntilItWaits();
        EXPECT_FALSE(end.HasReturned());
        enumerating.Open();
    }
    EXPECT_EQ(sink.Told(), (Told{{SHARE_SOURCE_EVENT_REMOVED, kEditor}}));
    EXPECT_EQ(IdsOf(applications), (Ids{kBrowser}));
}

// ---- Watching

TEST_F(AppEnumMac, HearsOfStartsAndEndsWhileItWatches) {
    CSourceSink sink;
    CAppEnumMac applications(true);
    applications.AddSink(&sink);
    applications.Refresh();
    server->RaiseApplication(platform::NoticeKind::ApplicationLaunched, 300);
    server->RaiseApplication(platform::NoticeKind::ApplicationEnded, kEditor);
    ASSERT_TRUE(sink.WasTold(2));
    EXPECT_EQ(sink.Told(), (Told{{SHARE_SOURCE_EVENT_ADDED, 300}, {SHARE_SOURCE_EVENT_REMOVED, kEditor}}));
    EXPECT_EQ(IdsOf(applications), (Ids{kBrowser, 300}));
}

TEST_F(AppEnumMac, HearsOfNothingWhenItDoesNotWatch) {
    CSourceSink deaf;
    CAppEnumMac still(false);
    still.AddSink(&deaf);
    CSourceSink sink;
    CAppEnumMac watching(true);
    watching.AddSink(&sink);
    server->RaiseApplication(platform::NoticeKind::ApplicationLaunched, 300);
    ASSERT_TRUE(sink.WasTold(1));
    EXPECT_TRUE(deaf.Told().empty());
    EXPECT_EQ(NumberOf(still), 0);
}

TEST_F(AppEnumMac, WaitsAtItsEndForAnEventThatRuns) {
    CTally inside;
    CGate gate;
    CSourceSink sink([&](SHARE_SOURCE_EVENT, IShareSource*) {
        inside.Add();
        EXPECT_TRUE(gate.Passes());
    });
    auto applications = std::make_unique<CAppEnumMac>(true);
    applications->AddSink(&sink);
    server->RaiseApplication(platform::NoticeKind::ApplicationLaunched, 300);
    ASSERT_TRUE(inside.Reaches(1));
    CCallOnThread end([&] { applications.reset(); });
    end.UntilItWaits();
    EXPECT_FALSE(end.HasReturned());
    gate.Open();
}

} // namespace
