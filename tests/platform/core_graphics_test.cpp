// SPDX-License-Identifier: Apache-2.0
#include "platform/core_graphics.h"

#include "platform/none/none_window_server.h"
#include "platform/platform_life.h"
#include "platform/window_services.h"
#include "tests/support/fake_window_server.h"
#include "tests/support/notice_fence.h"

#include <gtest/gtest.h>

#include <array>
#include <limits>
#include <memory>
#include <utility>
#include <vector>

namespace {

using namespace platform;

constexpr CGRect MAIN{{0, 0}, {1440, 900}};
constexpr CGRect RIGHT{{1440, -100}, {1280.75F, 800.5F}};

class CoreGraphics : public testing::Test {
protected:
    CoreGraphics() {
        m_server->SetDisplays({FakeDisplay(7, MAIN, 2.0F, "Studio"), FakeDisplay(3, RIGHT, 1.0F, "Beamer")});
    }
    ~CoreGraphics() override { Rest(); }

    CFakeWindowServerScope m_server;
};

/// With a window server that isn't there.
class CoreGraphicsWithoutServer : public testing::Test {
protected:
    CoreGraphicsWithoutServer() : m_former(ReplaceWindowServer(std::make_shared<NoneWindowServer>())) {}
    ~CoreGraphicsWithoutServer() override {
        Rest();
        ReplaceWindowServer(m_former);
    }

private:
    const std::shared_ptr<WindowServer> m_former;
};

using Calls = std::vector<std::pair<CGDirectDisplayID, unsigned>>;

void Record(CGDirectDisplayID display, unsigned flags, void* userInfo) {
    static_cast<Calls*>(userInfo)->emplace_back(display, flags);
}

} // namespace

TEST_F(CoreGraphics, TellsTheFirstDisplayAsTheMainOne) {
    EXPECT_EQ(CGMainDisplayID(), 7u);
    m_server->SetDisplays({});
    EXPECT_EQ(CGMainDisplayID(), kCGNullDirectDisplay);
}

TEST_F(CoreGraphics, TellsBoundsInPointsAndSizesCutToWholeOnes) {
    EXPECT_EQ(CGDisplayBounds(3), RIGHT);
    EXPECT_EQ(CGDisplayPixelsWide(3), 1280u);
    EXPECT_EQ(CGDisplayPixelsHigh(3), 800u);
    EXPECT_EQ(CGDisplayPixelsWide(7), 1440u) << "not the 2880 that the scale makes of them";
}

TEST_F(CoreGraphics, GivesZerosForAnUnknownDisplay) {
    EXPECT_EQ(CGDisplayBounds(8), CGRect{});
    EXPECT_EQ(CGDisplayPixelsWide(8), 0u);
    EXPECT_EQ(CGDisplayPixelsHigh(8), 0u);
    EXPECT_EQ(DisplayProductName(8), "");
}

TEST_F(CoreGraphics, KeepsImpossibleSizesWithinWhatCountsCanHold) {
    m_server->SetDisplays({FakeDisplay(1, {{0, 0}, {-5, std::numeric_limits<float>::quiet_NaN()}}),
                           FakeDisplay(2, {{0, 0}, {1e30F, 1}})});
    EXPECT_EQ(CGDisplayPixelsWide(1), 0u);
    EXPECT_EQ(CGDisplayPixelsHigh(1), 0u);
    EXPECT_EQ(CGDisplayPixelsWide(2), static_cast<std::size_t>(std::numeric_limits<int>::max()));
}

TEST_F(CoreGraphics, NamesDisplaysAsTheirProduct) {
    EXPECT_EQ(DisplayProductName(7), "Studio");
    EXPECT_EQ(DisplayProductName(3), "Beamer");
}

TEST_F(CoreGraphics, ListsDisplaysInTheServersOrder) {
    std::array<CGDirectDisplayID, 4> ids{9, 9, 9, 9};
    std::uint32_t count = 99;
    EXPECT_EQ(CGGetOnlineDisplayList(4, ids.data(), &count), kCGErrorSuccess);
    EXPECT_EQ(count, 2u);
    EXPECT_EQ(ids, (std::array<CGDirectDisplayID, 4>{7, 3, 9, 9}));
}

TEST_F(CoreGraphics, ListsNoMoreDisplaysThanThereIsRoomFor) {
    std::array<CGDirectDisplayID, 2> ids{9, 9};
    std::uint32_t count = 99;
    EXPECT_EQ(CGGetOnlineDisplayList(1, ids.data(), &count), kCGErrorSuccess);
    EXPECT_EQ(count, 1u);
    EXPECT_EQ(ids, (std::array<CGDirectDisplayID, 2>{7, 9}));
    EXPECT_EQ(CGGetOnlineDisplayList(0, nullptr, &count), kCGErrorSuccess);
    EXPECT_EQ(count, 2u) << "without room they are only counted";
    EXPECT_EQ(CGGetOnlineDisplayList(1, ids.data(), nullptr), kCGErrorIllegalArgument);
}

TEST_F(CoreGraphics, TellsAServerWithoutDisplaysFromNoServer) {
    CGDirectDisplayID id = 9;
    std::uint32_t count = 99;
    m_server->SetDisplays({});
    EXPECT_EQ(CGGetOnlineDisplayList(1, &id, &count), kCGErrorSuccess);
    EXPECT_EQ(count, 0u);
    count = 99;
    m_server->SetLife(Life::Lost);
    EXPECT_EQ(CGGetOnlineDisplayList(1, &id, &count), kCGErrorCannotComplete);
    EXPECT_EQ(count, 0u);
}

TEST_F(CoreGraphics, AnswersFromTheLastStateOfAStalledServer) {
    m_server->SetLife(Life::Stalled);
    EXPECT_EQ(CGMainDisplayID(), 7u);
    std::uint32_t count = 0;
    EXPECT_EQ(CGGetOnlineDisplayList(0, nullptr, &count), kCGErrorSuccess);
    EXPECT_EQ(count, 2u);
}

TEST_F(CoreGraphics, UsesAServerThatCameBack) {
    m_server->SetLife(Life::Lost);
    EXPECT_EQ(CGMainDisplayID(), kCGNullDirectDisplay);
    m_server->SetLife(Life::Alive);
    EXPECT_EQ(CGMainDisplayID(), 7u);
}

TEST_F(CoreGraphics, CallsBackWithTheBeginningAndThenWithWhatChanged) {
    Calls calls;
    ASSERT_EQ(CGDisplayRegisterReconfigurationCallback(Record, &calls), kCGErrorSuccess);
    m_server->RaiseDisplayChanged(3, DisplayAdded | DisplayDesktopShapeChanged);
    ASSERT_TRUE(NoticesAreDelivered(*m_server));
    EXPECT_EQ(CGDisplayRemoveReconfigurationCallback(Record, &calls), kCGErrorSuccess);
    EXPECT_EQ(calls, (Calls{{3, kCGDisplayBeginConfigurationFlag},
                            {3, kCGDisplayAddFlag | kCGDisplayDesktopShapeChangedFlag}}));
}

TEST_F(CoreGraphics, CallsBackForDisplaysOnly) {
    Calls calls;
    CGDisplayRegisterReconfigurationCallback(Record, &calls);
    m_server->RaiseApplication(NoticeKind::ApplicationLaunched, 5);
    ASSERT_TRUE(NoticesAreDelivered(*m_server));
    CGDisplayRemoveReconfigurationCallback(Record, &calls);
    EXPECT_TRUE(calls.empty());
}

TEST_F(CoreGraphics, TellsRegistrationsApartByTheirUserInfo) {
    Calls one;
    Calls other;
    CGDisplayRegisterReconfigurationCallback(Record, &one);
    CGDisplayRegisterReconfigurationCallback(Record, &other);
    EXPECT_EQ(CGDisplayRemoveReconfigurationCallback(Record, &one), kCGErrorSuccess);
    m_server->RaiseDisplayChanged(3, DisplayMoved);
    ASSERT_TRUE(NoticesAreDelivered(*m_server));
    EXPECT_TRUE(one.empty());
    EXPECT_EQ(other.size(), 2u);
    EXPECT_EQ(CGDisplayRemoveReconfigurationCallback(Record, &one), kCGErrorIllegalArgument);
    EXPECT_EQ(CGDisplayRemoveReconfigurationCallback(Record, &other), kCGErrorSuccess);
}

TEST_F(CoreGraphics, CallsAPairAsOftenAsItIsRegistered) {
    Calls calls;
    CGDisplayRegisterReconfigurationCallback(Record, &calls);
    CGDisplayRegisterReconfigurationCallback(Record, &calls);
    m_server->RaiseDisplayChanged(3, DisplayMoved);
    ASSERT_TRUE(NoticesAreDelivered(*m_server));
    EXPECT_EQ(calls.size(), 4u);
    EXPECT_EQ(CGDisplayRemoveReconfigurationCallback(Record, &calls), kCGErrorSuccess);
    m_server->RaiseDisplayChanged(3, DisplayMoved);
    ASSERT_TRUE(NoticesAreDelivered(*m_server));
    EXPECT_EQ(calls.size(), 6u);
    EXPECT_EQ(CGDisplayRemoveReconfigurationCallback(Record, &calls), kCGErrorSuccess);
    EXPECT_EQ(CGDisplayRemoveReconfigurationCallback(Record, &calls), kCGErrorIllegalArgument);
}

TEST_F(CoreGraphics, RefusesToCallNobody) {
    EXPECT_EQ(CGDisplayRegisterReconfigurationCallback(nullptr, this), kCGErrorIllegalArgument);
    EXPECT_FALSE(m_server->HasReceiver());
}

TEST_F(CoreGraphics, ShowsTheNewStateInBothCalls) {
    std::vector<CGRect> seen;
    const auto look = [](CGDirectDisplayID display, unsigned, void* userInfo) {
        static_cast<std::vector<CGRect>*>(userInfo)->push_back(CGDisplayBounds(display));
    };
    CGDisplayRegisterReconfigurationCallback(look, &seen);
    m_server->SetDisplays({FakeDisplay(3, MAIN)});
    m_server->RaiseDisplayChanged(3, DisplayMoved);
    ASSERT_TRUE(NoticesAreDelivered(*m_server));
    CGDisplayRemoveReconfigurationCallback(look, &seen);
    EXPECT_EQ(seen, (std::vector<CGRect>{MAIN, MAIN}));
}

TEST_F(CoreGraphics, KnowsThePublishedLevels) {
    EXPECT_EQ(CGWindowLevelForKey(kCGNormalWindowLevelKey), 0);
    EXPECT_EQ(CGWindowLevelForKey(7), 20);
    EXPECT_EQ(CGWindowLevelForKey(8), 24);
    EXPECT_EQ(CGWindowLevelForKey(kCGPopUpMenuWindowLevelKey), 101);
    EXPECT_LT(CGWindowLevelForKey(kCGDesktopWindowLevelKey), 0);
    EXPECT_LT(CGWindowLevelForKey(kCGDesktopWindowLevelKey),
              CGWindowLevelForKey(kCGDesktopIconWindowLevelKey));
    EXPECT_LT(CGWindowLevelForKey(kCGScreenSaverWindowLevelKey),
              CGWindowLevelForKey(kCGCursorWindowLevelKey));
    EXPECT_LT(CGWindowLevelForKey(kCGCursorWindowLevelKey), CGWindowLevelForKey(kCGMaximumWindowLevelKey));
    EXPECT_EQ(CGWindowLevelForKey(-1), 0);
    EXPECT_EQ(CGWindowLevelForKey(20), 0);
}

TEST_F(CoreGraphics, DescribesAWindowInFull) {
    WindowInfo window = FakeWindow(11, 500, RIGHT, 3);
    window.alpha = 0.5F;
    window.sharing = SharingState::ReadWrite;
    window.title = "Letter";
    m_server->SetWindows({window});
    m_server->SetApplications({FakeApplication(400, "Other"), FakeApplication(500, "Writer")});
    const auto windows = CGWindowListCopyWindowInfo(kCGWindowListOptionAll);
    ASSERT_EQ(windows.size(), 1u);
    EXPECT_EQ(windows[0].kCGWindowNumber, 11u);
    EXPECT_EQ(windows[0].kCGWindowLayer, 3);
    EXPECT_EQ(windows[0].kCGWindowBounds, RIGHT);
    EXPECT_EQ(windows[0].kCGWindowSharingState, kCGWindowSharingReadWrite);
    EXPECT_EQ(windows[0].kCGWindowAlpha, 0.5F);
    EXPECT_EQ(windows[0].kCGWindowOwnerPID, 500);
    EXPECT_EQ(windows[0].kCGWindowOwnerName, "Writer");
    EXPECT_EQ(windows[0].kCGWindowName, "Letter");
    EXPECT_TRUE(windows[0].kCGWindowIsOnscreen);
}

TEST_F(CoreGraphics, ListsTheWindowsThatTheOptionsAskForFrontFirst) {
    WindowInfo hidden = FakeWindow(2, 500, MAIN);
    hidden.onScreen = false;
    WindowInfo secret = FakeWindow(3, 500, MAIN);
    secret.sharing = SharingState::None;
    m_server->SetWindows({FakeWindow(1, 500, MAIN, 24), hidden, secret, FakeWindow(4, 1, MAIN, -1)});
    const auto ids = [](unsigned option) {
        std::vector<CGWindowID> list;
        for (const CGWindowDescription& window : CGWindowListCopyWindowInfo(option))
            list.push_back(window.kCGWindowNumber);
        return list;
    };
    EXPECT_EQ(ids(0), (std::vector<CGWindowID>{1, 2, 3, 4}));
    EXPECT_EQ(ids(0x01), (std::vector<CGWindowID>{1, 3, 4}));
    EXPECT_EQ(ids(0x10), (std::vector<CGWindowID>{1, 2, 3}));
    EXPECT_EQ(ids(0x11), (std::vector<CGWindowID>{1, 3}));
    EXPECT_EQ(CGWindowListCopyWindowInfo(0x11)[1].kCGWindowSharingState, 0);
}

TEST_F(CoreGraphics, DescribesListedWindowsInTheListsOrderWithoutUnknownOnes) {
    m_server->SetWindows({FakeWindow(1, 500, MAIN), FakeWindow(2, 500, RIGHT)});
    const std::vector<CGWindowID> asked{2, 77, 1, 2};
    const auto windows = CGWindowListCreateDescriptionFromArray(asked);
    ASSERT_EQ(windows.size(), 3u);
    EXPECT_EQ(windows[0].kCGWindowBounds, RIGHT);
    EXPECT_EQ(windows[1].kCGWindowBounds, MAIN);
    EXPECT_EQ(windows[2].kCGWindowNumber, 2u);
    EXPECT_TRUE(CGWindowListCreateDescriptionFromArray({}).empty());
}

TEST_F(CoreGraphics, DescribesListedWindowsAsTheThreadsWalkSawThem) {
    m_server->SetWindows({FakeWindow(1, 500, MAIN)});
    int id = 0;
    int read = 0;
    ASSERT_EQ(CGSGetOnScreenWindowList(CGSDefaultConnection(), 0, 1, &id, &read), kCGErrorSuccess);
    m_server->SetWindows({});
    const std::vector<CGWindowID> asked{1};
    EXPECT_EQ(CGWindowListCreateDescriptionFromArray(asked).size(), 1u);
    EXPECT_TRUE(CGWindowListCopyWindowInfo(0).empty()) << "a list of its own is of now";
}

TEST_F(CoreGraphics, TellsThePointersPlace) {
    m_server->SetPointer(CGPoint{12.5F, -3});
    EXPECT_EQ(CGEventGetLocation(CGEventCreate(nullptr)), (CGPoint{12.5F, -3}));
}

TEST_F(CoreGraphics, PutsAnUnknownPointerOutsideEveryDisplay) {
    m_server->SetPointer(std::nullopt);
    EXPECT_FALSE(CGEventCreate(nullptr).has_value());
    const CGPoint location = CGEventGetLocation(CGEventCreate(nullptr));
    EXPECT_FALSE(CGRectContainsPoint(MAIN, location));
    EXPECT_FALSE(CGRectContainsPoint({{-32768, -32768}, {65536, 65536}}, location));
}

TEST(CoreGraphicsGeometry, RectanglesAreHalfOpen) {
    constexpr CGRect RECT{{10, 20}, {30, 40}};
    EXPECT_TRUE(CGRectContainsPoint(RECT, {10, 20}));
    EXPECT_TRUE(CGRectContainsPoint(RECT, {39.9F, 59.9F}));
    EXPECT_FALSE(CGRectContainsPoint(RECT, {40, 30}));
    EXPECT_FALSE(CGRectContainsPoint(RECT, {20, 60}));
    EXPECT_FALSE(CGRectContainsPoint(RECT, {9.9F, 30}));
    EXPECT_FALSE(CGRectContainsPoint({{10, 20}, {0, 40}}, {10, 20}));
    EXPECT_TRUE(CGRectEqualToRect(RECT, {{10, 20}, {30, 40}}));
    EXPECT_FALSE(CGRectEqualToRect(RECT, {{10, 20}, {30, 41}}));
}

TEST_F(CoreGraphicsWithoutServer, EveryOperationGivesItsFailureValue) {
    EXPECT_EQ(CGMainDisplayID(), kCGNullDirectDisplay);
    EXPECT_EQ(CGDisplayBounds(1), CGRect{});
    EXPECT_EQ(CGDisplayPixelsWide(1), 0u);
    EXPECT_EQ(CGDisplayPixelsHigh(1), 0u);
    EXPECT_EQ(DisplayProductName(1), "");
    std::uint32_t count = 9;
    EXPECT_EQ(CGGetOnlineDisplayList(0, nullptr, &count), kCGErrorCannotComplete);
    EXPECT_EQ(count, 0u);
    EXPECT_TRUE(CGWindowListCopyWindowInfo(0).empty());
    const std::vector<CGWindowID> asked{1};
    EXPECT_TRUE(CGWindowListCreateDescriptionFromArray(asked).empty());
    EXPECT_FALSE(CGEventCreate(nullptr).has_value());
}

TEST_F(CoreGraphicsWithoutServer, ARegistrationWaitsForAServerToCome) {
    Calls calls;
    ASSERT_EQ(CGDisplayRegisterReconfigurationCallback(Record, &calls), kCGErrorSuccess);
    {
        const CFakeWindowServerScope server;
        server->RaiseDisplayChanged(3, DisplayAdded);
        ASSERT_TRUE(NoticesAreDelivered(*server));
    }
    EXPECT_EQ(calls.size(), 2u);
    EXPECT_EQ(CGDisplayRemoveReconfigurationCallback(Record, &calls), kCGErrorSuccess);
}
