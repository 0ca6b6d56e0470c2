// SPDX-License-Identifier: Apache-2.0
#include "platform/app_kit.h"

#include "platform/none/none_window_server.h"
#include "platform/platform_life.h"
#include "tests/support/call_on_thread.h"
#include "tests/support/fake_window_server.h"
#include "tests/support/notice_fence.h"
#include "tests/support/threads.h"

#include <gtest/gtest.h>

#include <atomic>
#include <cstdint>
#include <limits>
#include <memory>
#include <string>
#include <utility>
#include <vector>

namespace {

using namespace platform;

class AppKit : public testing::Test {
protected:
    ~AppKit() override { Rest(); }

    static std::vector<pid_t> WalkProcesses() {
        std::vector<pid_t> pids;
        ProcessSerialNumber process;
        while (GetNextProcess(&process) == noErr) {
            pid_t pid = 0;
            EXPECT_EQ(GetProcessPID(&process, &pid), noErr);
            pids.push_back(pid);
        }
        EXPECT_EQ(process, ProcessSerialNumber{});
        return pids;
    }

    CFakeWindowServerScope m_server;
};

using Starts = std::vector<std::pair<NSNotificationName, pid_t>>;

NSNotificationCenter& Center() {
    return *NSWorkspace::sharedWorkspace()->notificationCenter();
}

PicturePtr Pixels(int width, int height, float scale, PixelFormat format, std::vector<std::uint8_t> bytes,
                  std::size_t stride = 0) {
    const auto memory = std::make_shared<const std::vector<std::uint8_t>>(std::move(bytes));
    const auto picture = std::make_shared<Picture>();
    picture->width = width;
    picture->height = height;
    picture->stride = stride != 0 ? stride : static_cast<std::size_t>(width) * 4;
    picture->scale = scale;
    picture->format = format;
    picture->pixels = memory->data();
    picture->memory = memory;
    return picture;
}

PicturePtr Blank(int width, int height, float scale) {
    return Pixels(width, height, scale, PixelFormat::RGBA,
                  std::vector<std::uint8_t>(static_cast<std::size_t>(width * height) * 4));
}

std::shared_ptr<const CursorImage> Cursor(std::uint64_t serial, CGPoint hotSpot,
                                          std::vector<PicturePtr> pictures) {
    const auto cursor = std::make_shared<CursorImage>();
    cursor->serial = serial;
    cursor->hotSpot = hotSpot;
    cursor->representations = std::move(pictures);
    return cursor;
}

} // namespace

// ---- Screens

TEST_F(AppKit, CountsScreensFromTheBottomOfTheMainDisplay) {
    DisplayInfo main = FakeDisplay(7, {{0, 0}, {1440, 900}}, 2.0F);
    main.visibleBounds = {{0, 25}, {1440, 805}}; // menu bar 25, dock 70
    DisplayInfo right = FakeDisplay(3, {{1440, -100}, {1280, 800}}, 1.0F);
    right.visibleBounds = {{1500, -100}, {1220, 800}}; // dock at the left, 60
    m_server->SetDisplays({main, right});

    const std::vector<NSScreen> screens = NSScreen::screens();
    ASSERT_EQ(screens.size(), 2u);
    EXPECT_EQ(screens[0].deviceDescription().NSScreenNumber, 7u);
    EXPECT_EQ(screens[0].frame(), (CGRect{{0, 0}, {1440, 900}}));
    EXPECT_EQ(screens[0].visibleFrame(), (CGRect{{0, 70}, {1440, 805}}));
    EXPECT_EQ(screens[0].backingScaleFactor(), 2.0F);
    EXPECT_EQ(screens[1].deviceDescription().NSScreenNumber, 3u);
    EXPECT_EQ(screens[1].frame(), (CGRect{{1440, 200}, {1280, 800}}));
    EXPECT_EQ(screens[1].visibleFrame(), (CGRect{{1500, 200}, {1220, 800}}));
    EXPECT_EQ(screens[1].backingScaleFactor(), 1.0F);
}

// ---- Cursor

TEST_F(AppKit, ShowsTheCursorInAllItsResolutions) {
    m_server->SetCursor(Cursor(1, {3, 4}, {Blank(16, 24, 1.0F), Blank(32, 48, 2.0F)}));
    const auto cursor = NSCursor::currentSystemCursor();
    ASSERT_TRUE(cursor.has_value());
    EXPECT_EQ(cursor->hotSpot(), (CGPoint{3, 4}));
    EXPECT_EQ(cursor->image()->size(), (CGSize{16, 24}));
    ASSERT_EQ(cursor->image()->representations().size(), 2u);
    EXPECT_EQ(cursor->image()->representations()[0].size(), (CGSize{16, 24}));
    EXPECT_EQ(cursor->image()->representations()[1].size(), (CGSize{32, 48}));
    EXPECT_EQ(cursor->image()->representations()[1].CGImageForProposedRect()->width, 32);
}

TEST_F(AppKit, MeasuresACursorOfADenseScreenInPoints) {
    m_server->SetCursor(Cursor(1, {3, 4}, {Blank(32, 48, 2.0F)}));
    EXPECT_EQ(NSCursor::currentSystemCursor()->image()->size(), (CGSize{16, 24}));
    EXPECT_EQ(NSCursor::currentSystemCursor()->image()->CGImageForProposedRect()->width, 32);
}

TEST_F(AppKit, ShowsAnImageInItsOwnSizeUnlessAskedForMore) {
    m_server->SetCursor(Cursor(1, {0, 0}, {Blank(32, 32, 2.0F), Blank(16, 16, 1.0F), Blank(48, 48, 3.0F)}));
    EXPECT_EQ(NSCursor::currentSystemCursor()->image()->CGImageForProposedRect()->width, 16);
}

TEST_F(AppKit, GivesACursorsBytesInOneOrderWithoutGaps) {
    m_server->SetCursor(Cursor(
        1, {0, 0},
        {Pixels(1, 2, 1, PixelFormat::BGRA, {1, 2, 3, 4, 99, 99, 99, 99, 5, 6, 7, 8}, 8),
         Pixels(1, 1, 1, PixelFormat::RGBA, {1, 2, 3, 4}), Pixels(1, 1, 1, PixelFormat::BGRX, {1, 2, 3, 4}),
         Pixels(1, 1, 1, PixelFormat::RGBX, {1, 2, 3, 4})}));
    const auto cursor = NSCursor::currentSystemCursor();
    ASSERT_TRUE(cursor.has_value());
    const std::vector<std::vector<std::uint8_t>> expected{
        {3, 2, 1, 4, 7, 6, 5, 8}, {1, 2, 3, 4}, {3, 2, 1, 255}, {1, 2, 3, 255}};
    ASSERT_EQ(cursor->image()->representations().size(), expected.size());
    for (std::size_t i = 0; i < expected.size(); ++i) {
        const CGImageRef image = cursor->image()->representations()[i].CGImageForProposedRect();
        EXPECT_EQ(CGDataProviderCopyData(CGImageGetDataProvider(image)), expected[i]) << i;
        EXPECT_EQ(image->layout, CGPixelLayout::RGBA);
    }
}

TEST_F(AppKit, GivesTheSameImageAsLongAsTheCursorIsTheSame) {
    m_server->SetCursor(Cursor(1, {3, 4}, {Blank(16, 16, 1.0F)}));
    const auto first = NSCursor::currentSystemCursor()->image();
    EXPECT_EQ(NSCursor::currentSystemCursor()->image(), first);
    m_server->SetCursor(Cursor(2, {3, 4}, {Blank(16, 16, 1.0F)}));
    EXPECT_NE(NSCursor::currentSystemCursor()->image(), first);
}

TEST_F(AppKit, HasNoCursorWhereThereIsNothingToShow) {
    EXPECT_FALSE(NSCursor::currentSystemCursor().has_value());
    m_server->SetCursor(Cursor(1, {3, 4}, {}));
    EXPECT_FALSE(NSCursor::currentSystemCursor().has_value());
    m_server->SetCursor(
        Cursor(2, {3, 4}, {nullptr, Pixels(1, 1, 1, PixelFormat::X2R10G10B10, {1, 2, 3, 4})}));
    EXPECT_FALSE(NSCursor::currentSystemCursor().has_value());
}

TEST_F(AppKit, KeepsACursorThatIsNotOnScreenAnyMore) {
    m_server->SetCursor(Cursor(1, {3, 4}, {Pixels(1, 1, 1, PixelFormat::RGBA, {1, 2, 3, 4})}));
    const NSCursor kept = *NSCursor::currentSystemCursor();
    m_server->SetCursor(nullptr);
    EXPECT_EQ(CGDataProviderCopyData(kept.image()->CGImageForProposedRect()),
              (std::vector<std::uint8_t>{1, 2, 3, 4}));
}

// ---- Workspace

TEST_F(AppKit, TellsObserversWhichApplicationsComeAndGo) {
    Starts seen;
    const auto note = [&](const NSNotification& notification) {
        seen.emplace_back(notification.name, notification.userInfo.NSApplicationProcessIdentifier);
    };
    EXPECT_TRUE(Center().addObserver(&seen, note, NSWorkspaceDidLaunchApplicationNotification));
    EXPECT_TRUE(Center().addObserver(&seen, note, NSWorkspaceDidTerminateApplicationNotification));
    m_server->RaiseApplication(NoticeKind::ApplicationLaunched, 5);
    m_server->RaiseApplication(NoticeKind::ApplicationEnded, 6);
    m_server->RaiseDisplayChanged(1, DisplayMoved);
    ASSERT_TRUE(NoticesAreDelivered(*m_server));
    Center().removeObserver(&seen);
    EXPECT_EQ(seen, (Starts{{NSWorkspaceDidLaunchApplicationNotification, 5},
                            {NSWorkspaceDidTerminateApplicationNotification, 6}}));
}

TEST_F(AppKit, TellsObserversOnlyTheNoticeThatTheyAskedFor) {
    int calls = 0;
    Center().addObserver(
        &calls, [&](const NSNotification&) { ++calls; }, NSWorkspaceDidTerminateApplicationNotification);
    m_server->RaiseApplication(NoticeKind::ApplicationLaunched, 5);
    ASSERT_TRUE(NoticesAreDelivered(*m_server));
    Center().removeObserver(&calls);
    EXPECT_EQ(calls, 0);
}

TEST_F(AppKit, RemovesAllOfOneObserverAndNothingOfOthers) {
    int one = 0;
    int other = 0;
    for (const NSNotificationName name :
         {NSWorkspaceDidLaunchApplicationNotification, NSWorkspaceDidLaunchApplicationNotification,
          NSWorkspaceDidTerminateApplicationNotification}) {
        Center().addObserver(
            &one, [&](const NSNotification&) { ++one; }, name);
        Center().addObserver(
            &other, [&](const NSNotification&) { ++other; }, name);
    }
    Center().removeObserver(&one);
    m_server->RaiseApplication(NoticeKind::ApplicationLaunched, 5);
    m_server->RaiseApplication(NoticeKind::ApplicationEnded, 5);
    ASSERT_TRUE(NoticesAreDelivered(*m_server));
    Center().removeObserver(&other);
    EXPECT_EQ(one, 0);
    EXPECT_EQ(other, 3);
}

TEST_F(AppKit, RefusesAnObserverWithoutASelector) {
    EXPECT_FALSE(Center().addObserver(this, nullptr, NSWorkspaceDidLaunchApplicationNotification));
    EXPECT_FALSE(m_server->HasReceiver());
}

TEST_F(AppKit, ObserversMayRemoveThemselvesInsideTheirCall) {
    CTally calls;
    Center().addObserver(
        &calls,
        [&](const NSNotification&) {
            calls.Add();
            Center().removeObserver(&calls);
        },
        NSWorkspaceDidLaunchApplicationNotification);
    m_server->RaiseApplication(NoticeKind::ApplicationLaunched, 5);
    m_server->RaiseApplication(NoticeKind::ApplicationLaunched, 6);
    ASSERT_TRUE(NoticesAreDelivered(*m_server));
    EXPECT_EQ(calls.Count(), 1);
}

// ---- Running applications

TEST_F(AppKit, FindsRunningApplicationsByTheirProcess) {
    m_server->SetApplications({FakeApplication(5, "Writer"), FakeApplication(6, "Müller")});
    const auto application = NSRunningApplication::runningApplicationWithProcessIdentifier(6);
    ASSERT_TRUE(application.has_value());
    EXPECT_EQ(application->localizedName(), "Müller");
    EXPECT_EQ(application->processIdentifier(), 6);
    EXPECT_FALSE(NSRunningApplication::runningApplicationWithProcessIdentifier(7).has_value());
}

TEST_F(AppKit, BringsAnApplicationToTheFront) {
    m_server->SetApplications({FakeApplication(5, "Writer")});
    const auto application = NSRunningApplication::runningApplicationWithProcessIdentifier(5);
    EXPECT_TRUE(application->activateWithOptions(3));
    EXPECT_EQ(m_server->BroughtToFront(), std::vector<pid_t>{5});
    m_server->SetCanBringToFront(false);
    EXPECT_FALSE(application->activateWithOptions(3));
}

// ---- Process manager

TEST_F(AppKit, WalksEachProcessOnce) {
    EXPECT_TRUE(WalkProcesses().empty());
    m_server->SetApplications({FakeApplication(30, "C"), FakeApplication(10, "A"), FakeApplication(20, "B")});
    EXPECT_EQ(WalkProcesses(), (std::vector<pid_t>{10, 20, 30}));
}

TEST_F(AppKit, WalksOnOverProcessesThatComeAndGo) {
    m_server->SetApplications({FakeApplication(10, "A"), FakeApplication(20, "B"), FakeApplication(30, "C")});
    ProcessSerialNumber process;
    ASSERT_EQ(GetNextProcess(&process), noErr);
    ASSERT_EQ(GetNextProcess(&process), noErr);
    m_server->SetApplications({FakeApplication(30, "C"), FakeApplication(5, "New")});
    pid_t pid = 0;
    EXPECT_EQ(GetProcessPID(&process, &pid), procNotFound) << "the second one has ended";
    ASSERT_EQ(GetNextProcess(&process), noErr);
    EXPECT_EQ(GetProcessPID(&process, &pid), noErr);
    EXPECT_EQ(pid, 30);
    EXPECT_EQ(GetNextProcess(&process), procNotFound);
}

TEST_F(AppKit, TellsApplicationsFromOtherProcesses) {
    ApplicationInfo helper = FakeApplication(20, "Helper");
    helper.kind = ApplicationKind::Other;
    helper.fileName = "java";
    ApplicationInfo daemon = FakeApplication(30, "Daemon");
    daemon.backgroundOnly = true;
    m_server->SetApplications({FakeApplication(10, "Writer"), helper, daemon});

    ProcessSerialNumber process;
    ProcessInfoRec information;
    GetNextProcess(&process);
    ASSERT_EQ(GetProcessInformation(&process, &information), noErr);
    EXPECT_EQ(information.processType, 0x4150504Cu) << "APPL";
    EXPECT_EQ(information.processMode & modeOnlyBackground, 0u);
    EXPECT_EQ(information.processName, "Writer");

    GetNextProcess(&process);
    ASSERT_EQ(GetProcessInformation(&process, &information), noErr);
    for (const OSType listed : {FourCharCode("APPC"), FourCharCode("APPD"), FourCharCode("APPL"),
                                FourCharCode("BNDL"), FourCharCode("cdev"), FourCharCode("dfil")}) {
        EXPECT_NE(information.processType, listed);
    }
    EXPECT_EQ(information.processAppSpec, "java");

    GetNextProcess(&process);
    ASSERT_EQ(GetProcessInformation(&process, &information), noErr);
    EXPECT_EQ(information.processType, FourCharCode("APPL"));
    EXPECT_EQ(information.processMode & modeOnlyBackground, modeOnlyBackground);
}

TEST_F(AppKit, KnowsProcessesThatOnlyShowWindows) {
    m_server->SetWindows({FakeWindow(1, 77, {{0, 0}, {1, 1}}), FakeWindow(2, 0, {{0, 0}, {1, 1}})});
    ProcessSerialNumber process;
    EXPECT_EQ(GetProcessForPID(77, &process), noErr);
    pid_t pid = 0;
    EXPECT_EQ(GetProcessPID(&process, &pid), noErr);
    EXPECT_EQ(pid, 77);
    const ProcessSerialNumber before = process;
    EXPECT_EQ(GetProcessForPID(78, &process), procNotFound);
    EXPECT_EQ(GetProcessForPID(0, &process), procNotFound) << "the owner that can't be told is nobody";
    EXPECT_EQ(GetProcessForPID(std::numeric_limits<pid_t>::min(), &process), procNotFound);
    EXPECT_EQ(process, before);
}

TEST_F(AppKit, RefusesProcessesThatCannotBe) {
    pid_t pid = 9;
    ProcessInfoRec information;
    for (const ProcessSerialNumber process :
         {ProcessSerialNumber{0, 0}, ProcessSerialNumber{1, 10}, ProcessSerialNumber{0, 0xFFFFFFFFu}}) {
        EXPECT_EQ(GetProcessPID(&process, &pid), procNotFound);
        EXPECT_EQ(GetProcessInformation(&process, &information), procNotFound);
    }
    EXPECT_EQ(pid, 9);
    const ProcessSerialNumber process;
    EXPECT_EQ(GetProcessPID(nullptr, &pid), paramErr);
    EXPECT_EQ(GetProcessPID(&process, nullptr), paramErr);
    EXPECT_EQ(GetProcessInformation(&process, nullptr), paramErr);
    EXPECT_EQ(GetNextProcess(nullptr), paramErr);
    EXPECT_EQ(GetProcessForPID(5, nullptr), paramErr);
}

TEST_F(AppKit, GivesFailuresWithoutAServer) {
    ReplaceWindowServer(std::make_shared<NoneWindowServer>());
    EXPECT_TRUE(NSScreen::screens().empty());
    EXPECT_FALSE(NSCursor::currentSystemCursor().has_value());
    EXPECT_FALSE(NSRunningApplication::runningApplicationWithProcessIdentifier(5).has_value());
    EXPECT_TRUE(WalkProcesses().empty());
    ProcessSerialNumber process;
    EXPECT_EQ(GetProcessForPID(5, &process), procNotFound);
}
