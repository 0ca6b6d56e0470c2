// SPDX-License-Identifier: Apache-2.0
#include "platform/window_services.h"

#include "platform/app_kit.h"
#include "platform/none/none_window_server.h"
#include "platform/platform_life.h"
#include "tests/support/fake_window_server.h"
#include "tests/support/threads.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <array>
#include <chrono>
#include <cstddef>
#include <memory>
#include <thread>
#include <vector>

namespace {

using namespace platform;
using namespace std::chrono_literals;

constexpr CGRect FRAME{{10, 20}, {300, 200}};

class WindowServices : public testing::Test {
protected:
    WindowServices() {
        WindowInfo hidden = FakeWindow(2, 500, FRAME, 5);
        hidden.onScreen = false;
        WindowInfo glass = FakeWindow(3, 600, {{0, 0}, {50, 60}}, 24);
        glass.alpha = 0.25F;
        m_server->SetWindows({FakeWindow(1, 500, FRAME), hidden, glass, FakeWindow(4, 0, FRAME, -1)});
    }
    ~WindowServices() override { Rest(); }

    static std::vector<int> List(CGSConnectionID target = 0) {
        std::array<int, 16> ids{};
        int read = 0;
        EXPECT_EQ(CGSGetOnScreenWindowList(CGSDefaultConnection(), target, 16, ids.data(), &read),
                  kCGErrorSuccess);
        return {ids.begin(), ids.begin() + read};
    }

    static int LevelOf(CGWindowID window) {
        int level = -1000;
        CGSGetWindowLevel(CGSDefaultConnection(), window, &level);
        return level;
    }

    CManualClockScope m_clock;
    CFakeWindowServerScope m_server;
};

} // namespace

TEST_F(WindowServices, CountAndListWhatIsOnScreenFrontFirst) {
    int count = 0;
    EXPECT_EQ(CGSGetOnScreenWindowCount(CGSDefaultConnection(), 0, &count), kCGErrorSuccess);
    EXPECT_EQ(count, 3);
    EXPECT_EQ(List(), (std::vector<int>{1, 3, 4}));
}

TEST_F(WindowServices, CountAndListTheWindowsOfOneConnection) {
    CGSConnectionID owner = 0;
    ASSERT_EQ(CGSGetWindowOwner(CGSDefaultConnection(), 3, &owner), kCGErrorSuccess);
    int count = 0;
    EXPECT_EQ(CGSGetOnScreenWindowCount(CGSDefaultConnection(), owner, &count), kCGErrorSuccess);
    EXPECT_EQ(count, 1);
    EXPECT_EQ(List(owner), std::vector<int>{3});
}

TEST_F(WindowServices, TellHowManyThereAreWhenThereIsLessRoom) {
    std::array<int, 3> ids{-7, -7, -7};
    int read = 0;
    EXPECT_EQ(CGSGetOnScreenWindowList(CGSDefaultConnection(), 0, 2, ids.data(), &read), kCGErrorSuccess);
    EXPECT_EQ(read, 3);
    EXPECT_EQ(ids, (std::array<int, 3>{1, 3, -7}));
    read = 0;
    EXPECT_EQ(CGSGetOnScreenWindowList(CGSDefaultConnection(), 0, 0, nullptr, &read), kCGErrorSuccess);
    EXPECT_EQ(read, 3);
}

TEST_F(WindowServices, KeepTheBitsOfIdsThatAnIntCannotHold) {
    m_server->SetWindows({FakeWindow(0xFFFFFFFEu, 500, FRAME, 9)});
    const std::vector<int> ids = List();
    ASSERT_EQ(ids.size(), 1u);
    EXPECT_EQ(static_cast<CGWindowID>(ids[0]), 0xFFFFFFFEu);
    EXPECT_EQ(LevelOf(static_cast<CGWindowID>(ids[0])), 9);
}

TEST_F(WindowServices, TellLevelAlphaAndRectangleOfAWindow) {
    int level = 0;
    float alpha = 0;
    CGRect rect;
    EXPECT_EQ(CGSGetWindowLevel(CGSDefaultConnection(), 3, &level), kCGErrorSuccess);
    EXPECT_EQ(level, 24);
    EXPECT_EQ(CGSGetWindowAlpha(CGSDefaultConnection(), 3, &alpha), kCGErrorSuccess);
    EXPECT_EQ(alpha, 0.25F);
    EXPECT_EQ(CGSGetScreenRectForWindow(CGSDefaultConnection(), 2, &rect), kCGErrorSuccess);
    EXPECT_EQ(rect, FRAME) << "also of one that is off the screen";
}

TEST_F(WindowServices, LeaveOutParametersAloneForAnUnknownWindow) {
    int level = -1;
    float alpha = 1.0F;
    CGRect rect = FRAME;
    CGSConnectionID owner = 5;
    const CGSConnectionID connection = CGSDefaultConnection();
    EXPECT_EQ(CGSGetWindowLevel(connection, 99, &level), kCGErrorIllegalArgument);
    EXPECT_EQ(CGSGetWindowAlpha(connection, 99, &alpha), kCGErrorIllegalArgument);
    EXPECT_EQ(CGSGetScreenRectForWindow(connection, 99, &rect), kCGErrorIllegalArgument);
    EXPECT_EQ(CGSGetWindowOwner(connection, 99, &owner), kCGErrorIllegalArgument);
    EXPECT_EQ(level, -1);
    EXPECT_EQ(alpha, 1.0F);
    EXPECT_EQ(rect, FRAME);
    EXPECT_EQ(owner, 5u);
}

TEST_F(WindowServices, RefuseNoConnectionAndNoRoomForTheAnswer) {
    int number = 0;
    const CGSConnectionID connection = CGSDefaultConnection();
    EXPECT_EQ(CGSGetWindowLevel(0, 1, &number), kCGErrorInvalidConnection);
    EXPECT_EQ(CGSGetOnScreenWindowCount(0, 0, &number), kCGErrorInvalidConnection);
    EXPECT_EQ(CGSGetOnScreenWindowList(0, 0, 1, &number, &number), kCGErrorInvalidConnection);
    EXPECT_EQ(CGSGetWindowLevel(connection, 1, nullptr), kCGErrorIllegalArgument);
    EXPECT_EQ(CGSGetWindowAlpha(connection, 1, nullptr), kCGErrorIllegalArgument);
    EXPECT_EQ(CGSGetScreenRectForWindow(connection, 1, nullptr), kCGErrorIllegalArgument);
    EXPECT_EQ(CGSGetWindowOwner(connection, 1, nullptr), kCGErrorIllegalArgument);
    EXPECT_EQ(CGSGetOnScreenWindowCount(connection, 0, nullptr), kCGErrorIllegalArgument);
    EXPECT_EQ(CGSGetOnScreenWindowList(connection, 0, 1, nullptr, &number), kCGErrorIllegalArgument);
    EXPECT_EQ(CGSGetOnScreenWindowList(connection, 0, -1, &number, &number), kCGErrorIllegalArgument);
    EXPECT_EQ(CGSConnectionGetPID(connection, nullptr), kCGErrorIllegalArgument);
}

TEST_F(WindowServices, GiveEachOwnerOneConnectionThatLeadsBackToIt) {
    CGSConnectionID first = 0;
    CGSConnectionID hidden = 0;
    CGSConnectionID other = 0;
    EXPECT_EQ(CGSGetWindowOwner(CGSDefaultConnection(), 1, &first), kCGErrorSuccess);
    EXPECT_EQ(CGSGetWindowOwner(CGSDefaultConnection(), 2, &hidden), kCGErrorSuccess);
    EXPECT_EQ(CGSGetWindowOwner(CGSDefaultConnection(), 3, &other), kCGErrorSuccess);
    EXPECT_EQ(first, hidden);
    EXPECT_NE(first, other);
    pid_t pid = 0;
    EXPECT_EQ(CGSConnectionGetPID(first, &pid), kCGErrorSuccess);
    EXPECT_EQ(pid, 500);
    EXPECT_EQ(CGSConnectionGetPID(other, &pid), kCGErrorSuccess);
    EXPECT_EQ(pid, 600);
}

TEST_F(WindowServices, TellThatAnOwnerIsNotKnown) {
    CGSConnectionID owner = 5;
    EXPECT_EQ(CGSGetWindowOwner(CGSDefaultConnection(), 4, &owner), kCGErrorFailure);
    EXPECT_EQ(owner, 5u);
}

TEST_F(WindowServices, KnowTheConnectionOfThisProcess) {
    pid_t pid = 0;
    EXPECT_EQ(CGSConnectionGetPID(CGSDefaultConnection(), &pid), kCGErrorSuccess);
    EXPECT_EQ(pid, getpid());
}

TEST_F(WindowServices, TakeNoProcessIdForAConnection) {
    pid_t pid = 7;
    EXPECT_EQ(CGSConnectionGetPID(500, &pid), kCGErrorInvalidConnection);
    EXPECT_EQ(CGSConnectionGetPID(0x80000000u, &pid), kCGErrorInvalidConnection);
    EXPECT_EQ(pid, 7);
}

TEST_F(WindowServices, FindTheConnectionOfAProcess) {
    ProcessSerialNumber process;
    ASSERT_EQ(GetProcessForPID(600, &process), noErr);
    CGSConnectionID connection = 0;
    EXPECT_EQ(CGSGetConnectionIDForPSN(CGSDefaultConnection(), &process, &connection), kCGErrorSuccess);
    CGSConnectionID owner = 0;
    CGSGetWindowOwner(CGSDefaultConnection(), 3, &owner);
    EXPECT_EQ(connection, owner);

    process = {};
    connection = 5;
    EXPECT_EQ(CGSGetConnectionIDForPSN(CGSDefaultConnection(), &process, &connection),
              kCGErrorIllegalArgument);
    EXPECT_EQ(CGSGetConnectionIDForPSN(CGSDefaultConnection(), nullptr, &connection),
              kCGErrorIllegalArgument);
    EXPECT_EQ(connection, 5u);
}

TEST_F(WindowServices, AnswerAWalkAsOfItsListHoweverTheDesktopGoesOn) {
    List();
    m_server->SetWindows({FakeWindow(1, 500, {{99, 99}, {1, 1}}, 77)});
    EXPECT_EQ(LevelOf(1), 0);
    EXPECT_EQ(LevelOf(3), 24);
    CGRect rect;
    CGSGetScreenRectForWindow(CGSDefaultConnection(), 1, &rect);
    EXPECT_EQ(rect, FRAME);
    CGSConnectionID owner = 0;
    EXPECT_EQ(CGSGetWindowOwner(CGSDefaultConnection(), 3, &owner), kCGErrorSuccess);
    float alpha = 0;
    EXPECT_EQ(CGSGetWindowAlpha(CGSDefaultConnection(), 3, &alpha), kCGErrorSuccess);
}

TEST_F(WindowServices, ListAndCountAreAlwaysOfNow) {
    List();
    m_server->SetWindows({FakeWindow(8, 500, FRAME, 77)});
    int count = 0;
    CGSGetOnScreenWindowCount(CGSDefaultConnection(), 0, &count);
    EXPECT_EQ(count, 1);
    EXPECT_EQ(LevelOf(1), 0) << "counting pins nothing";
    EXPECT_EQ(List(), std::vector<int>{8});
    EXPECT_EQ(LevelOf(1), -1000) << "listing pins anew";
    EXPECT_EQ(LevelOf(8), 77);
}

TEST_F(WindowServices, HoldAMomentForAHundredMillisecondsAtMost) {
    List();
    m_server->SetWindows({FakeWindow(1, 500, FRAME, 77)});
    m_clock->Advance(99ms);
    EXPECT_EQ(LevelOf(1), 0);
    m_clock->Advance(1ms);
    EXPECT_EQ(LevelOf(1), 77);
}

TEST_F(WindowServices, HoldAMomentForTheThreadThatListed) {
    List();
    m_server->SetWindows({FakeWindow(1, 500, FRAME, 77)});
    int elsewhere = 0;
    std::thread([&] {
        elsewhere = LevelOf(1);
        List();
        m_server->SetWindows({FakeWindow(1, 500, FRAME, 88)});
        EXPECT_EQ(LevelOf(1), 77);
    }).join();
    EXPECT_EQ(elsewhere, 77);
    EXPECT_EQ(LevelOf(1), 0);
}

TEST_F(WindowServices, ForgetTheMomentOfAReplacedServer) {
    List();
    const CFakeWindowServerScope next;
    next->SetWindows({FakeWindow(1, 500, FRAME, 55)});
    EXPECT_EQ(LevelOf(1), 55);
}

TEST_F(WindowServices, TellTheGenerationOfThePinnedMoment) {
    EXPECT_EQ(PinnedWindowGeneration(), 0u) << "nothing is pinned yet";
    List();
    const std::uint64_t listed = m_server->GetWindows()->Generation();
    ASSERT_GT(listed, 0u);
    EXPECT_EQ(PinnedWindowGeneration(), listed);
    m_server->SetWindows({FakeWindow(1, 500, FRAME)});
    ASSERT_GT(m_server->GetWindows()->Generation(), listed);
    EXPECT_EQ(PinnedWindowGeneration(), listed) << "the desktop has gone on, and the walk hasn't";
    int count = 0;
    CGSGetOnScreenWindowCount(CGSDefaultConnection(), 0, &count);
    EXPECT_EQ(PinnedWindowGeneration(), listed) << "counting pins nothing";
    List();
    EXPECT_EQ(PinnedWindowGeneration(), m_server->GetWindows()->Generation());
}

TEST_F(WindowServices, TellNoGenerationOfAMomentThatHoldsNoMore) {
    List();
    m_clock->Advance(99ms);
    EXPECT_NE(PinnedWindowGeneration(), 0u);
    m_clock->Advance(1ms);
    EXPECT_EQ(PinnedWindowGeneration(), 0u);
}

TEST_F(WindowServices, TellNoGenerationOnceAListCouldNotBeHad) {
    List();
    EXPECT_NE(PinnedWindowGeneration(), 0u);
    int read = 0;
    EXPECT_EQ(CGSGetOnScreenWindowList(0, 0, 0, nullptr, &read), kCGErrorInvalidConnection);
    EXPECT_EQ(PinnedWindowGeneration(), 0u) << "what was listed before is not what is there now";
    List();
    EXPECT_EQ(PinnedWindowGeneration(), m_server->GetWindows()->Generation());
}

TEST_F(WindowServices, TellTheGenerationToTheThreadThatListed) {
    List();
    const std::uint64_t listed = PinnedWindowGeneration();
    m_server->SetWindows({});
    std::thread([this, listed] {
        EXPECT_EQ(PinnedWindowGeneration(), 0u);
        List();
        EXPECT_EQ(PinnedWindowGeneration(), m_server->GetWindows()->Generation());
        EXPECT_NE(PinnedWindowGeneration(), listed);
    }).join();
    EXPECT_EQ(PinnedWindowGeneration(), listed);
}

TEST_F(WindowServices, TellNoGenerationOfAnotherServersMoment) {
    List();
    const CFakeWindowServerScope next;
    next->SetWindows({FakeWindow(1, 500, FRAME)});
    EXPECT_EQ(PinnedWindowGeneration(), 0u);
    List();
    EXPECT_EQ(PinnedWindowGeneration(), next->GetWindows()->Generation());
}

TEST_F(WindowServices, KnowAMomentAgainWhileNothingIsToldOtherwise) {
    List();
    const CGSMoment first = CGSPinnedMoment();
    EXPECT_NE(first.windows, nullptr);
    List();
    EXPECT_EQ(CGSPinnedMoment(), first);
    m_server->SetWindows({FakeWindow(1, 500, FRAME)});
    EXPECT_EQ(CGSPinnedMoment(), first) << "pinned";
    List();
    const CGSMoment second = CGSPinnedMoment();
    EXPECT_FALSE(second == first);
    m_server->SetDisplays({FakeDisplay(1, {{0, 0}, {200, 120}})});
    EXPECT_FALSE(CGSPinnedMoment() == second) << "displays aren't pinned";
}

TEST_F(WindowServices, HaveNoWindowsOfAMomentThatHoldsNoMore) {
    EXPECT_EQ(CGSPinnedMoment().windows, nullptr);
    List();
    m_clock->Advance(100ms);
    EXPECT_EQ(CGSPinnedMoment().windows, nullptr);
    List();
    EXPECT_NE(CGSPinnedMoment().windows, nullptr);
    m_server->SetLife(Life::Lost);
    int read = 0;
    CGSGetOnScreenWindowList(CGSDefaultConnection(), 0, 0, nullptr, &read);
    EXPECT_EQ(CGSPinnedMoment().windows, nullptr);
}

TEST_F(WindowServices, TellWhetherAWindowGivesItsPixels) {
    WindowInfo secret = FakeWindow(2, 500, FRAME);
    secret.sharing = SharingState::None;
    m_server->SetWindows({FakeWindow(1, 500, FRAME), secret});
    CGWindowSharingType state = kCGWindowSharingReadWrite;
    EXPECT_EQ(CGSGetSharingState(CGSDefaultConnection(), 2, &state), kCGErrorSuccess);
    EXPECT_EQ(state, kCGWindowSharingNone);
    EXPECT_EQ(CGSGetSharingState(CGSDefaultConnection(), 1, &state), kCGErrorSuccess);
    EXPECT_EQ(state, kCGWindowSharingReadOnly);
    EXPECT_EQ(CGSGetSharingState(CGSDefaultConnection(), 9, &state), kCGErrorIllegalArgument);
    EXPECT_EQ(CGSGetSharingState(0, 1, &state), kCGErrorInvalidConnection);
    EXPECT_EQ(CGSGetSharingState(CGSDefaultConnection(), 1, nullptr), kCGErrorIllegalArgument);
}

TEST_F(WindowServices, TellTheOwnersOfManyWindowsAsOfOneMoment) {
    const CGSWindowOwners owners(CGSDefaultConnection());
    const CGSWindowOwners nobodys(0);
    CGSConnectionID expected = 0;
    ASSERT_EQ(CGSGetWindowOwner(CGSDefaultConnection(), 3, &expected), kCGErrorSuccess);
    m_server->SetWindows({});
    const int asked = m_server->calls.windows;
    CGSConnectionID owner = 7;
    EXPECT_EQ(owners.Get(4, &owner), kCGErrorFailure) << "nobody's";
    EXPECT_EQ(owners.Get(9, &owner), kCGErrorIllegalArgument) << "not there";
    EXPECT_EQ(owners.Get(3, nullptr), kCGErrorIllegalArgument);
    EXPECT_EQ(nobodys.Get(3, &owner), kCGErrorInvalidConnection);
    EXPECT_EQ(owner, 7u);
    EXPECT_EQ(owners.Get(3, &owner), kCGErrorSuccess);
    EXPECT_EQ(owner, expected);
    EXPECT_EQ(m_server->calls.windows, asked) << "nobody is asked";
}

TEST_F(WindowServices, LetGoOfMomentsThatAreOver) {
    m_server->SetWindows({FakeWindow(1, 500, FRAME)});
    const std::weak_ptr<const WindowSnapshot> first = m_server->GetWindows();
    std::thread([] { List(); }).join();
    m_server->SetWindows({});
    EXPECT_FALSE(first.expired());
    m_clock->Advance(100ms);
    List();
    EXPECT_TRUE(first.expired());

    const std::weak_ptr<const WindowSnapshot> second = m_server->GetWindows();
    m_server->SetWindows({});
    EXPECT_FALSE(second.expired());
    Rest();
    EXPECT_TRUE(second.expired());
}

TEST_F(WindowServices, GiveFailuresWithoutAServer) {
    const CGSConnectionID connection = CGSDefaultConnection();
    ReplaceWindowServer(std::make_shared<NoneWindowServer>());
    EXPECT_EQ(CGSDefaultConnection(), 0u);
    int number = -5;
    int read = -5;
    EXPECT_EQ(CGSGetOnScreenWindowCount(connection, 0, &number), kCGErrorCannotComplete);
    EXPECT_EQ(CGSGetOnScreenWindowList(connection, 0, 1, &number, &read), kCGErrorCannotComplete);
    EXPECT_EQ(CGSGetWindowLevel(connection, 1, &number), kCGErrorIllegalArgument);
    EXPECT_EQ(number, -5);
    EXPECT_EQ(read, -5);
}

TEST_F(WindowServices, HaveNoConnectionToALostServerAndOneToAStalledOne) {
    m_server->SetLife(Life::Stalled);
    EXPECT_NE(CGSDefaultConnection(), 0u);
    EXPECT_EQ(List(), (std::vector<int>{1, 3, 4}));
    m_server->SetLife(Life::Lost);
    EXPECT_EQ(CGSDefaultConnection(), 0u);
}
