// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/mac/monitor_enum_mac.h"
#include "tests/src/share_source_tools.h"
#include "tests/support/fake_window_server.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

using Ids = std::vector<unsigned long>;
using Lines = std::vector<std::string>;
using Told = std::vector<SourceEvent>;

inline constexpr unsigned kMain = 1;
inline constexpr unsigned kSide = 7;
inline constexpr unsigned kAbsent = 99;

inline constexpr unsigned kMoved = 0x2;
inline constexpr unsigned kAdd = 0x10;
inline constexpr unsigned kRemove = 0x20;

inline platform::DisplayInfo MainDisplay() {
    return FakeDisplay(kMain, {{0, 0}, {1440, 900}}, 1.0F, "Main panel");
}

inline platform::DisplayInfo SideDisplay() {
    return FakeDisplay(kSide, {{1440, 0}, {1280, 800}}, 2.0F, "Side panel");
}

/// Two displays, and nobody watching yet.
class MonitorEnumMac : public testing::Test {
protected:
    MonitorEnumMac() { server->SetDisplays({MainDisplay(), SideDisplay()}); }

    CFakeWindowServerScope server;
};
