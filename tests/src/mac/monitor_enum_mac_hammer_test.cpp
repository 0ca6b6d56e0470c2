// SPDX-License-Identifier: Apache-2.0
#include "src/mac/monitor_enum_mac.h"

#include "tests/src/share_source_tools.h"
#include "tests/support/fake_window_server.h"
#include "tests/support/test_effort.h"

#include <gtest/gtest.h>

#include <atomic>
#include <cstdio>
#include <random>
#include <thread>
#include <vector>

namespace {

using Ids = std::vector<unsigned long>;

constexpr unsigned kDisplays = 5;
constexpr unsigned kSentinel = 77;

/// Puts a random choice of displays on the desktop and raises a notice of one of them.
void Rearrange(CFakeWindowServer& server, std::mt19937& random) {
    constexpr unsigned flags[] = {0x10, 0x20, 0x2, 0x12, 0x1000};
    platform::DisplayList displays;
    for (unsigned id = 1; id <= kDisplays; ++id) {
        if (random() % 2 == 0)
            displays.push_back(FakeDisplay(id, {{0, 0}, {100, 50}}));
    }
    server.SetDisplays(displays);
    server.RaiseDisplayChanged(1 + static_cast<unsigned>(random() % kDisplays), flags[random() % 5]);
}

/// A sink that uses the source of each event: its place, its name.
CSourceSink::During LookAtSource() {
    return [](SHARE_SOURCE_EVENT, IShareSource* source) {
        char name[33];
        source->GetName(name, 32);
        EXPECT_EQ(source->GetSourceType(), SHARE_SOURCE_TYPE_MONITOR);
    };
}

/// One short life in the middle of all that: made, asked, ended.
void LiveShortly() {
    CSourceSink sink(LookAtSource());
    CMonitorEnumMac monitors(true);
    monitors.AddSink(&sink);
    monitors.Refresh();
    for (const unsigned long id : IdsOf(monitors))
        EXPECT_LE(id, kDisplays);
}

void RefreshUntil(CMonitorEnumMac& monitors, const std::atomic<bool>& done) {
    while (!done) {
        monitors.Refresh();
        CHeldSource source;
        if (monitors.GetSource(NumberOf(monitors) - 1, source.Out()) == 0) {
            char name[33];
            source->GetName(name, 32);
        }
    }
}

TEST(MonitorEnumMacHammer, StandsNoticesThatRaceWithRefreshesAndWithItsEnd) {
    const unsigned seed = std::random_device()();
    const int rounds = 5000 * TestEffort();
    std::printf("%d changes and lives, seed %u\n", rounds, seed);
    const CFakeWindowServerScope server;
    CTally last;
    CSourceSink sink([&](SHARE_SOURCE_EVENT event, IShareSource* source) {
        LookAtSource()(event, source);
        if (source->GetSourceUniqueId() == kSentinel)
            last.Add();
    });
    CMonitorEnumMac monitors(true);
    monitors.AddSink(&sink);
    std::atomic<bool> done{false};
    std::thread refreshing([&] { RefreshUntil(monitors, done); });
    std::thread passing([&] {
        for (int round = 0; round < rounds; ++round)
            LiveShortly();
    });
    std::mt19937 random(seed);
    for (int round = 0; round < rounds; ++round)
        Rearrange(*server, random);
    passing.join();
    done = true;
    refreshing.join();

    server->SetDisplays({FakeDisplay(kSentinel, {{0, 0}, {1, 1}})});
    server->RaiseDisplayChanged(kSentinel, 0x12);
    ASSERT_TRUE(last.Reaches(2));
    EXPECT_EQ(IdsOf(monitors), (Ids{kSentinel}));
    monitors.RemoveSink(&sink);
}

} // namespace
