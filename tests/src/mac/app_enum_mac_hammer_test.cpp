// SPDX-License-Identifier: Apache-2.0
#include "src/mac/app_enum_mac.h"

#include "tests/src/share_source_tools.h"
#include "tests/support/fake_window_server.h"
#include "tests/support/test_effort.h"

#include <gtest/gtest.h>

#include <atomic>
#include <cstdio>
#include <random>
#include <string>
#include <thread>
#include <vector>

namespace {

constexpr pid_t kMostProcesses = 12;
constexpr pid_t kSentinel = 77;

/// Starts or ends some process, and tells.
void StartOrEnd(CFakeWindowServer& server, std::vector<bool>& runs, std::mt19937& random) {
    const auto index = random() % runs.size();
    const auto pid = static_cast<pid_t>(index + 1);
    runs[index] = !runs[index];
    platform::ApplicationList processes;
    for (std::size_t i = 0; i < runs.size(); ++i) {
        if (runs[i])
            processes.push_back(FakeApplication(static_cast<pid_t>(i + 1), "App " + std::to_string(i)));
    }
    server.SetApplications(processes);
    server.RaiseApplication(
        runs[index] ? platform::NoticeKind::ApplicationLaunched : platform::NoticeKind::ApplicationEnded,
        pid);
}

CSourceSink::During LookAtSource() {
    return [](SHARE_SOURCE_EVENT, IShareSource* source) {
        char name[33];
        source->GetName(name, 32);
        EXPECT_EQ(source->GetSourceType(), SHARE_SOURCE_TYPE_APP);
    };
}

/// One short life in the middle of all that: made, asked, ended.
void LiveShortly() {
    CSourceSink sink(LookAtSource());
    CAppEnumMac applications(true);
    applications.AddSink(&sink);
    applications.Refresh();
    for (const unsigned long id : IdsOf(applications))
        EXPECT_LE(id, static_cast<unsigned long>(kMostProcesses));
}

TEST(AppEnumMacHammer, StandsNoticesThatRaceWithRefreshesAndWithItsEnd) {
    const unsigned seed = std::random_device()();
    const int rounds = 2000 * TestEffort();
    std::printf("%d starts, ends and lives, seed %u\n", rounds, seed);
    const CFakeWindowServerScope server;
    server->SetDisplays({FakeDisplay(1, {{0, 0}, {100, 50}})});
    CTally last;
    CSourceSink sink([&](SHARE_SOURCE_EVENT event, IShareSource* source) {
        LookAtSource()(event, source);
        if (source->GetSourceUniqueId() == static_cast<unsigned long>(kSentinel))
            last.Add();
    });
    CAppEnumMac applications(true);
    applications.AddSink(&sink);
    std::atomic<bool> done{false};
    std::thread refreshing([&] {
        while (!done) {
            applications.Refresh();
            applications.GetPrimaryMonitorRect();
        }
    });
    std::thread passing([&] {
        for (int round = 0; round < rounds; ++round)
            LiveShortly();
    });
    std::mt19937 random(seed);
    std::vector<bool> runs(kMostProcesses, false);
    for (int round = 0; round < rounds; ++round)
        StartOrEnd(*server, runs, random);
    passing.join();
    done = true;
    refreshing.join();

    server->RaiseApplication(platform::NoticeKind::ApplicationLaunched, kSentinel);
    ASSERT_TRUE(last.Reaches(1));
    applications.Refresh();
    std::vector<unsigned long> running;
    for (std::size_t i = 0; i < runs.size(); ++i) {
        if (runs[i])
            running.push_back(i + 1);
    }
    EXPECT_EQ(IdsOf(applications), running);
    applications.RemoveSink(&sink);
}

} // namespace
