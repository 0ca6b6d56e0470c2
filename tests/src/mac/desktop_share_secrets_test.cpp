// SPDX-License-Identifier: Apache-2.0
#include "tests/src/mac/desktop_share_bench.h"
#include "tests/support/sanitizer.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <thread>

// A share with something kept out, on a window server that fails at the worst moment and with frames that are
// used again and again.

using namespace platform;

namespace {

class DesktopShareSecrets : public DesktopShareBench {};

} // namespace

TEST_F(DesktopShareSecrets, AreNotShownWhicheverCallToTheWindowServerFails) {
    ShareSideWithoutSecrets();
    Tick();
    constexpr unsigned STRIDE = SCREENSHARE_TEST_SANITIZED != 0 ? 5 : 1;
    unsigned shown = 0;
    for (const SimulatedOperation operation :
         {SimulatedOperation::GetLife, SimulatedOperation::GetWindows, SimulatedOperation::GetDisplays,
          SimulatedOperation::GetCapability, SimulatedOperation::GetApplications,
          SimulatedOperation::GetPointerPosition, SimulatedOperation::TakeWindowPicture}) {
        for (unsigned nth = 1; nth <= 60; nth += STRIDE) {
            const std::size_t before = client.sink.FrameCount();
            desktop->FailNth(operation, nth, PictureOutcome::Failed);
            Tick();
            desktop->Heal(operation);
            ASSERT_EQ(client.Last().Count(RED), 0) << static_cast<int>(operation) << " call " << nth;
            shown += client.sink.FrameCount() > before ? 1 : 0;
            TickUntilRest();
        }
    }
    EXPECT_GT(shown, 100 / STRIDE);
}

TEST_F(DesktopShareSecrets, LeaveNothingInTheFramesThatShowedThem) {
    for (const PixelFormat wallpaper : {PixelFormat::BGRX, PixelFormat::BGRA}) {
        SCOPED_TRACE(wallpaper == PixelFormat::BGRX ? "opaque" : "with alpha");
        desktop->Show(SecretDesk(wallpaper).Build());
        if (client->GetCaptureShareSourceCount() == 0) {
            client.ShareMonitor(SIDE);
            client.Start();
        }
        client->RemoveUnSharedProcess(static_cast<unsigned>(SECRETS));
        client->RemoveUnSharedWindow(SECRET_OF_EDITOR);
        TickUntilRest();
        Tick(2); // both frames of the engine have shown it
        EXPECT_EQ(client.Last().Count(RED), 30 * 20 + 10 * 10);
        KeepSecrets();
        SettleWorker(); // one change and not two, with a pause of its own after each
        TickUntilRest();
        const std::size_t before = client.sink.FrameCount();
        for (int i = 0; i < 4; ++i) {
            Tick();
            EXPECT_EQ(client.Last().Count(RED), 0);
        }
        EXPECT_EQ(client.sink.FrameCount(), before + 4);
        EXPECT_EQ(client.Last().Count(GREEN), 40 * 20);
    }
}

TEST_F(DesktopShareSecrets, LeaveNothingWhereNothingIsBehindThem) {
    desktop->CloseWindow(WALLPAPER);
    client.ShareMonitor(SIDE);
    client.Start();
    Tick(2);
    EXPECT_EQ(client.Last().Count(RED), 30 * 20 + 10 * 10);
    KeepSecrets();
    SettleWorker();
    TickUntilRest();
    Tick(2);
    EXPECT_EQ(client.Last().Count(RED), 0);
    EXPECT_EQ(client.Last().Count(0), 100 * 60 - 40 * 20);
}

TEST_F(DesktopShareSecrets, LeaveBlackWhenTheyAreAllThatThereIs) {
    desktop->CloseWindow(WALLPAPER);
    desktop->CloseWindow(EDITOR_WINDOW);
    client.ShareMonitor(SIDE);
    client.Start();
    Tick(2);
    EXPECT_EQ(client.Last().Count(RED), 30 * 20 + 10 * 10);
    KeepSecrets();
    SettleWorker();
    TickUntilRest();
    Tick(2);
    EXPECT_EQ(client.Last().Size(), (TVLSize{100, 60}));
    EXPECT_EQ(client.Last().Count(0), 100 * 60) << "no window at all is no failure";
    EXPECT_FALSE(client.sink.WaitForNotice("error -203", 1, std::chrono::seconds(0)));
}

TEST_F(DesktopShareSecrets, AreOurOwnWindowsAgainWithEachNewBackEnd) {
    const pid_t own = getpid();
    ApplicationInfo clientApplication;
    clientApplication.pid = own;
    clientApplication.name = "Client";
    desktop->StartApplication(clientApplication);
    desktop->SetOwner(SECRET_WINDOW, own);
    client.ShareMonitor(SIDE);
    EXPECT_EQ(client->AddUnSharedWindow(SECRET_OF_EDITOR), 0);
    client.Start();
    Tick();
    EXPECT_EQ(client.Last().Count(RED), 0) << "as it is by itself";
    EXPECT_EQ(client->SetFilterSelf(false), 0);
    SettleWorker();
    TickUntilRest();
    EXPECT_EQ(client.Last().Count(RED), 30 * 20);
    EXPECT_EQ(client->SetCaptureMode(SCREEN_CAPTURER_TYPE_AVFOUNDATION), 0);
    EXPECT_EQ(client->SetCaptureMode(SCREEN_CAPTURER_TYPE_DEFAULT), 0);
    SettleWorker();
    TickUntilRest();
    EXPECT_EQ(client.Last().Count(RED), 0);
}

TEST_F(DesktopShareSecrets, AreKeptAlsoWhenToldWhileTheCapturerIsBeingReplaced) {
    client.ShareMonitor(SIDE);
    client.Start();
    Tick();
    EXPECT_EQ(client->SetCaptureMode(SCREEN_CAPTURER_TYPE_AVFOUNDATION), 0);
    SettleWorker();
    for (unsigned nth = 1; nth <= 3; ++nth) {
        desktop->DoAt(SimulatedOperation::GetDisplays, nth,
                      [this] { std::thread([this] { KeepSecrets(); }).join(); });
    }
    EXPECT_EQ(client->SetCaptureMode(SCREEN_CAPTURER_TYPE_DEFAULT), 0);
    SettleWorker();
    desktop->Heal(SimulatedOperation::GetDisplays);
    TickUntilRest();
    EXPECT_EQ(client.Last().Count(RED), 0);
    EXPECT_EQ(client.Last().Count(GREEN), 40 * 20);
}

TEST_F(DesktopShareSecrets, AreNotInThePictureThatIsSentAgain) {
    client.ShareMonitor(SIDE);
    client.Start();
    TickUntilRest();
    ASSERT_GT(client.Last().Count(RED), 0) << "nothing is kept out yet";
    client.sink.Clear();
    KeepSecrets();
    SettleWorker();
    for (int i = 0; i < 20; ++i) {
        desktop->MoveWindow(SECRET_WINDOW, {215, i % 2 == 0 ? 15.0F : 16.0F}); // a drag, for four seconds
        Tick();
        EXPECT_TRUE(client.sink.FrameCount() == 0 || client.Last().Count(RED) == 0) << "tick " << i;
    }
    TickUntilRest();
    EXPECT_EQ(client.Last().Count(RED), 0);
    EXPECT_GT(client.Last().Count(GREEN), 0) << "a fresh picture follows";
}
