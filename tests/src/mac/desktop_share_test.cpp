// SPDX-License-Identifier: Apache-2.0
#include "platform/core_graphics.h"
#include "tests/platform/conformance_checks.h"
#include "tests/platform/conformance_fixture.h"
#include "tests/src/mac/desktop_share_desk.h"
#include "util/cm_clock.h"

#include <screenshare/share_engine.h>

#include <gtest/gtest.h>

#include <chrono>
#include <cstddef>
#include <string>

// Shares of a monitor from the client's first call to the pixels in its sink, on every kind of desktop. What
// must not be seen is pure red, and nothing else has any red. What hangs on exact times is in
// desktop_share_timing_test.cpp.

using namespace platform;

namespace {

using namespace std::chrono_literals;

constexpr std::uint32_t BLACK = 0;
constexpr std::uint32_t RED = 0xFF0000;
constexpr std::uint32_t GREEN = 0x00FF00;
constexpr std::uint32_t BLUE = 0x0000FF;
constexpr std::uint32_t TEAL = 0x008080;

constexpr TVLSize SIDE_SIZE{100, 60};
constexpr CGPoint FAR_AWAY{5, 110};

CGRect Rect(float x, float y, float width, float height) {
    return {{x, y}, {width, height}};
}

/// On the display beside the main one: a wallpaper, a text, a secret in front of a part of it, and another
/// one of the editor's own. The side display starts at `left`.
class DesktopShare : public testing::TestWithParam<ShareDeskKind> {
protected:
    void SetUp() override {
        if (m_desk == nullptr)
            GTEST_SKIP() << "this machine lacks what it takes";
        const auto monitor = m_desk->AddDisplay({100, 60});
        NEEDS(monitor);
        side = *monitor;
        m_desk->Settle();
        left = CGDisplayBounds(side).origin.x;
        const auto painting = m_desk->StartApplication("Desktop");
        const auto editing = m_desk->StartApplication("Editor");
        const auto hiding = m_desk->StartApplication("Secrets");
        NEEDS(painting && editing && hiding);
        desktop = *painting;
        editor = *editing;
        secrets = *hiding;
        OpenWindows();
        if (IsSkipped())
            return;
        WaitUntilPainted(wallpaper, BLUE);
        WaitUntilPainted(editorWindow, GREEN);
        WaitUntilPainted(secretWindow, RED);
        WaitUntilPainted(secretOfEditor, RED);
    }

    /// An application paints when it comes to it. From then on the first frame has to show it.
    void WaitUntilPainted(CGWindowID window, std::uint32_t rgb) {
        EXPECT_TRUE(RunUntil([&] {
            WindowPictureRequest request;
            request.windows = {window};
            request.rect = Rect(-10000, -10000, 30000, 30000);
            request.deadline = CmSteadyNow() + PATIENCE;
            const auto picture = m_desk->Server().TakeWindowPicture(request).picture;
            return picture != nullptr && picture->layers.size() == 1 &&
                   Shows(*picture->layers[0].picture, rgb);
        }));
    }

    void OpenWindows() {
        const auto back = m_desk->AddWindow(desktop, WallpaperFrame(), BLUE);
        const auto text = m_desk->AddWindow(editor, TextFrame(), GREEN);
        const auto secret = m_desk->AddWindow(secrets, SecretFrame(), RED);
        const auto own = m_desk->AddWindow(editor, OwnSecretFrame(), RED);
        NEEDS(back && text && secret && own);
        wallpaper = *back;
        editorWindow = *text;
        secretWindow = *secret;
        secretOfEditor = *own;
        NEEDS(m_desk->MovePointer(FAR_AWAY));
        m_desk->Settle();
    }
    /// A window manager may have taken them to another monitor while theirs was away.
    void PutWindowsBack() {
        EXPECT_TRUE(m_desk->SetFrame(wallpaper, WallpaperFrame()));
        EXPECT_TRUE(m_desk->SetFrame(editorWindow, TextFrame()));
        EXPECT_TRUE(m_desk->SetFrame(secretWindow, SecretFrame()));
        EXPECT_TRUE(m_desk->SetFrame(secretOfEditor, OwnSecretFrame()));
        m_desk->Settle();
    }
    /// Of the window that the application has there; 0 for none.
    CGWindowID NumberOf(pid_t owner, const CGRect& frame) {
        const auto snapshot = m_desk->Server().GetWindows();
        for (const WindowInfo& window : snapshot->Windows()) {
            if (window.owner == owner && window.frame == frame)
                return window.id;
        }
        ADD_FAILURE() << "nothing of " << owner << " is listed there";
        return 0;
    }
    /// Where windows don't outlive their server: as their applications do it, which are still the same.
    void OpenWindowsAgain() {
        if (m_desk->WindowsOutliveALoss())
            return;
        OpenWindows();
        // By the number that is listed: an application may be given one that another window had.
        secretWindow = NumberOf(secrets, SecretFrame());
        editorWindow = NumberOf(editor, TextFrame());
        secretOfEditor = NumberOf(editor, OwnSecretFrame());
        EXPECT_EQ(client->AddUnSharedWindow(secretOfEditor), 0);
        // A frame that is made meanwhile may still show it.
        EXPECT_TRUE(RunUntil([&] { return !client->IsWindowShared(secretOfEditor); }));
    }

    void KeepSecrets() {
        EXPECT_EQ(client->AddUnSharedProcess(static_cast<unsigned>(secrets)), 0);
        EXPECT_EQ(client->AddUnSharedWindow(secretOfEditor), 0);
    }
    /// From here on the picture is the side display with its secrets kept.
    void ShareSideWithoutSecrets() {
        client.ShareMonitor(side);
        KeepSecrets();
        client.Start();
        ASSERT_TRUE(RunUntil([&] { return client.sink.FrameCount() > 0; }));
        ExpectNoSecrets();
    }

    void Run(std::chrono::milliseconds time) { m_shareDesk->Run(*client, time); }
    template <class Condition>
    [[nodiscard]] bool RunUntil(Condition holds) {
        return m_shareDesk->RunUntil(*client, holds);
    }
    [[nodiscard]] bool RunUntilCount(std::uint32_t rgb, int count) {
        return RunUntil([&] { return client.Last().Count(rgb) == count; });
    }
    [[nodiscard]] bool RunUntilSize(TVLSize size) {
        return RunUntil([&] { return client.Last().Size() == size; });
    }
    [[nodiscard]] bool Told(const std::string& notice) { return client.sink.CountNotices(notice) > 0; }

    void ExpectNoSecrets() {
        EXPECT_EQ(client.Last().Count(RED), 0);
        EXPECT_EQ(client.Last().Count(GREEN), 40 * 20) << "whole, also under the secret";
    }
    CGRect WallpaperFrame() const { return Rect(left, 0, 100, 60); }
    CGRect TextFrame() const { return Rect(left + 10, 10, 40, 20); }
    CGRect SecretFrame() const { return Rect(left + 30, 20, 30, 20); }
    CGRect OwnSecretFrame() const { return Rect(left + 80, 40, 10, 10); }
    TVLRect SideRect(int width, int height) const {
        const auto x = static_cast<int>(left);
        return {x, 0, x + width, height};
    }
    static std::string Size(int width, int height) {
        return std::to_string(width) + "x" + std::to_string(height);
    }
    std::string SidePosition(int width, int height) const {
        return "position " + std::to_string(static_cast<int>(left)) + ",0 " + Size(width, height);
    }

    CSettingsScope settings;
    const std::unique_ptr<ShareDesk> m_shareDesk = GetParam().make();
    ConformanceDesk* const m_desk = m_shareDesk != nullptr ? &m_shareDesk->Desk() : nullptr;
    CShareClient client;

    CGDirectDisplayID side = 0;
    float left = 0;
    pid_t desktop = 0;
    pid_t editor = 0;
    pid_t secrets = 0;
    CGWindowID wallpaper = 0;
    CGWindowID editorWindow = 0;
    CGWindowID secretWindow = 0;
    CGWindowID secretOfEditor = 0;
};

} // namespace

// ---- What is seen

TEST_P(DesktopShare, ShowsTheSecondMonitorWhole) {
    client.ShareMonitor(side);
    client.Start();
    ASSERT_TRUE(RunUntil([&] { return client.sink.FrameCount() > 0; }));
    const DeliveredShot shot = client.Last();
    EXPECT_EQ(shot.Size(), SIDE_SIZE);
    EXPECT_EQ(shot.meta.rectCapture, SideRect(100, 60));
    EXPECT_EQ(shot.frame.Get()->GetFrameDataFormat(), SHARE_FRAME_FORMAT_RGBA);
    EXPECT_EQ(shot.frame.Get()->GetFrameLineBytes(), 100 * 4);
    EXPECT_NE(shot.frame.Get()->GetTimestamp(), 0u);
    EXPECT_EQ(shot.Count(RED), 30 * 20 + 10 * 10);
    EXPECT_EQ(shot.Count(GREEN), 40 * 20 - 20 * 10);
    EXPECT_EQ(shot.Count(BLUE), 100 * 60 - 40 * 20 - 30 * 20 - 10 * 10 + 20 * 10);
    EXPECT_EQ(shot.At(10, 10), Rgb(GREEN));
    EXPECT_EQ(shot.At(9, 10), Rgb(BLUE));
    EXPECT_EQ(shot.At(80, 40), Rgb(RED));
    EXPECT_EQ(client.sink.Frames().back().update, (TVLRect{0, 0, 100, 60}));
    EXPECT_EQ(client->Stop(), 0);
}

TEST_P(DesktopShare, TellsWhereItsMonitorIsAndHowLarge) {
    client->SetSink(&client.sink);
    client.ShareMonitor(side);
    EXPECT_TRUE(client.sink.WaitForNotice("size " + Size(100, 60)));
    EXPECT_TRUE(client.sink.WaitForNotice(SidePosition(100, 60)));
    client.Start();
    EXPECT_TRUE(client.sink.WaitForNotice("status 1"));
    ASSERT_TRUE(RunUntil([&] { return client.sink.FrameCount() > 0; }));
    TVLSize size{};
    client->GetCaptureSize(size);
    EXPECT_EQ(size, SIDE_SIZE);
    const SHARE_CAPTURE_STATISTIC statistic = client.Statistic();
    EXPECT_EQ(statistic.nCaptureWidth, 100);
    EXPECT_EQ(statistic.nCaptureHeight, 60);
    EXPECT_EQ(statistic.eCaptureMode, SCREEN_CAPTURER_TYPE_DEFAULT);
    EXPECT_EQ(statistic.nFlags, 0u);
}

TEST_P(DesktopShare, StartsOnTheMainMonitorWhenNoneWasChosen) {
    const auto window = m_desk->AddWindow(desktop, Rect(0, 0, 200, 120), TEAL);
    NEEDS(window);
    NEEDS(m_desk->MovePointer({left + 90, 5}));
    m_desk->Settle();
    WaitUntilPainted(*window, TEAL);
    const CGRect main = CGDisplayBounds(CGMainDisplayID());
    client.Start();
    ASSERT_TRUE(RunUntil([&] { return client.sink.FrameCount() > 0; }));
    EXPECT_EQ(client.Last().Size(),
              (TVLSize{static_cast<int>(main.size.width), static_cast<int>(main.size.height)}));
    EXPECT_EQ(client.Last().Count(TEAL), 200 * 120);
    EXPECT_EQ(client.Last().Count(RED), 0) << "that is on the other one";
}

TEST_P(DesktopShare, ShowsAnotherMonitorWhenItIsSelected) {
    ShareSideWithoutSecrets();
    EXPECT_EQ(client->SelectSharedDisplay(CGMainDisplayID()), 0);
    const CGRect main = CGDisplayBounds(CGMainDisplayID());
    EXPECT_TRUE(RunUntilSize({static_cast<int>(main.size.width), static_cast<int>(main.size.height)}));
    EXPECT_EQ(client.Last().Count(GREEN), 0);
    EXPECT_EQ(client->SelectSharedDisplay(side), 0);
    EXPECT_TRUE(RunUntilSize(SIDE_SIZE));
    ExpectNoSecrets();
}

TEST_P(DesktopShare, FitsIntoTheLimitOfItsClient) {
    ShareSideWithoutSecrets();
    EXPECT_EQ(client->SetCaptureMaxFrameSize(50, 40), 0);
    EXPECT_TRUE(RunUntilSize({50, 30}));
    EXPECT_EQ(client.Last().meta.rectCapture, SideRect(100, 60)) << "the same, only smaller";
    EXPECT_EQ(client.Last().Count(GREEN), 20 * 10);
    EXPECT_EQ(client.Last().Count(BLUE), 50 * 30 - 20 * 10);
    EXPECT_EQ(client->SetCaptureMaxFrameSize(1920, 1080), 0);
    EXPECT_TRUE(RunUntilSize(SIDE_SIZE));
    ExpectNoSecrets();
}

TEST_P(DesktopShare, CentresItsPictureInAFrameOfFixedSize) {
    settings->m_bCaptureResampleFixSizeEnable = true;
    settings->m_nResampleScreenCaptureWidth = 1000;
    settings->m_nResampleScreenCaptureHeight = 700;
    client.ShareMonitor(side);
    KeepSecrets();
    client.Start();
    EXPECT_EQ(client->SetCaptureMaxFrameSize(50, 40), 0) << "which nothing comes of";
    ASSERT_TRUE(RunUntilSize({1000, 700}));
    const DeliveredShot shot = client.Last();
    EXPECT_EQ(shot.meta.rectCapture, SideRect(100, 60));
    EXPECT_EQ(shot.Count(BLACK), 1000 * 100) << "above and below";
    EXPECT_EQ(shot.Count(RED), 0);
    EXPECT_EQ(shot.At(0, 49), Rgb(BLACK));
    EXPECT_EQ(shot.At(0, 50), Rgb(BLUE));
    EXPECT_EQ(shot.At(999, 649), Rgb(BLUE));
    EXPECT_EQ(shot.At(999, 650), Rgb(BLACK));
    EXPECT_EQ(shot.At(300, 250), Rgb(GREEN)) << "the middle of the text";
}

TEST_P(DesktopShare, ShowsThePointerUnlessItIsToldNotTo) {
    // In the text's right part, clear of its edges.
    NEEDS(m_desk->MovePointer({left + 30, 15}));
    m_desk->Settle();
    client.ShareMonitor(side);
    KeepSecrets();
    client.Start();
    EXPECT_TRUE(
        RunUntil([&] { return client.sink.FrameCount() > 0 && client.Last().Count(GREEN) < 40 * 20; }));
    EXPECT_TRUE(client.Last().meta.bPointerCaptured);
    EXPECT_EQ(client.Last().At(15, 25), Rgb(GREEN)) << "away from the pointer";
    const unsigned flags = SHARE_CONFIG_FLAG_NO_POINTER;
    EXPECT_EQ(ShareConfig(SHARE_CONFIG_FLAG, &flags, sizeof(flags)), 0);
    EXPECT_TRUE(RunUntilCount(GREEN, 40 * 20));
    EXPECT_FALSE(client.Last().meta.bPointerCaptured);
    NEEDS(m_desk->MovePointer(FAR_AWAY));
    EXPECT_TRUE(RunUntil([&] { return client.Last().meta.bPointerCaptured; })) << "nothing is missing then";
}

// ---- What is kept out

TEST_P(DesktopShare, KeepsAnApplicationAndAWindowOut) {
    ShareSideWithoutSecrets();
    EXPECT_EQ(client.Last().Count(BLUE), 100 * 60 - 40 * 20);
    EXPECT_FALSE(client->IsWindowShared(secretWindow));
    EXPECT_FALSE(client->IsWindowShared(secretOfEditor));
    EXPECT_TRUE(client->IsWindowShared(editorWindow));
}

TEST_P(DesktopShare, TakesASecretOutAndBringsItBackWhileItRuns) {
    client.ShareMonitor(side);
    client.Start();
    EXPECT_TRUE(RunUntilCount(RED, 30 * 20 + 10 * 10));
    EXPECT_EQ(client->AddUnSharedProcess(static_cast<unsigned>(secrets)), 0);
    EXPECT_TRUE(RunUntilCount(RED, 10 * 10));
    EXPECT_EQ(client->AddUnSharedWindow(secretOfEditor), 0);
    EXPECT_TRUE(RunUntilCount(RED, 0));
    ExpectNoSecrets();
    EXPECT_EQ(client->RemoveUnSharedProcess(static_cast<unsigned>(secrets)), 0);
    EXPECT_TRUE(RunUntilCount(RED, 30 * 20));
    EXPECT_EQ(client->RemoveUnSharedWindow(secretOfEditor), 0);
    EXPECT_TRUE(RunUntilCount(RED, 30 * 20 + 10 * 10));
}

TEST_P(DesktopShare, KeepsTheWindowOutThatASecretiveApplicationOpensLater) {
    ShareSideWithoutSecrets();
    NEEDS(m_desk->AddWindow(secrets, Rect(left, 0, 100, 60), RED));
    const auto chat = m_desk->StartApplication("Chat");
    NEEDS(chat);
    NEEDS(m_desk->AddWindow(*chat, Rect(left + 60, 0, 10, 10), TEAL));
    m_desk->Settle();
    EXPECT_TRUE(RunUntilCount(TEAL, 10 * 10)) << "what opened after it is there";
    ExpectNoSecrets();
}

TEST_P(DesktopShare, ShowsNothingOfASecretThatIsRaisedMovedAndMadeLarger) {
    ShareSideWithoutSecrets();
    NEEDS(m_desk->SetFrame(secretWindow, Rect(left, 0, 100, 60)));
    NEEDS(m_desk->Raise(secretWindow));
    NEEDS(m_desk->SetFrame(editorWindow, Rect(left + 50, 30, 40, 20))); // tells that it has looked again
    m_desk->Settle();
    EXPECT_TRUE(RunUntil([&] { return client.Last().At(89, 49) == Rgb(GREEN); }));
    ExpectNoSecrets();
}

// ---- What happens to a desktop

TEST_P(DesktopShare, TellsThatWindowsAreDraggedAndThenShowsWhereTheyAre) {
    ShareSideWithoutSecrets();
    // What may be seen changes with a secret alone: behind the text is the wallpaper.
    NEEDS(m_desk->SetFrame(secretWindow, Rect(left, 0, 30, 20)));
    NEEDS(m_desk->SetFrame(editorWindow, Rect(left + 50, 30, 40, 20)));
    m_desk->Settle();
    EXPECT_TRUE(RunUntil([&] { return Told("event 1001 -303"); }));
    EXPECT_TRUE(RunUntil([&] { return client.Last().At(50, 30) == Rgb(GREEN); }));
    EXPECT_EQ(client.Last().At(10, 10), Rgb(BLUE));
    ExpectNoSecrets();
}

TEST_P(DesktopShare, TellsOfADragThatGoesOnAndShowsThePictureOnceItEnds) {
    ShareSideWithoutSecrets();
    int steps = 0;
    EXPECT_TRUE(RunUntil([&] {
        const auto shift = static_cast<float>(++steps % 20);
        EXPECT_TRUE(m_desk->SetFrame(secretWindow, Rect(left + shift, 0, 30, 20)));
        return client.sink.CountNotices("event 1001 -303") > 2;
    })) << "after "
        << steps << " steps";
    EXPECT_GT(steps, 1);
    EXPECT_EQ(client.Last().Count(RED), 0) << "the last one from before the drag";
    NEEDS(m_desk->SetFrame(secretWindow, Rect(left + 60, 5, 30, 20)));
    NEEDS(m_desk->SetFrame(editorWindow, Rect(left + 5, 35, 40, 20)));
    m_desk->Settle();
    EXPECT_TRUE(RunUntil([&] { return client.Last().At(5, 54) == Rgb(GREEN); }));
    EXPECT_TRUE(RunUntilCount(BLUE, 100 * 60 - 40 * 20));
    ExpectNoSecrets();
}

TEST_P(DesktopShare, ComesBackWithTheMonitorThatWasUnplugged) {
    ShareSideWithoutSecrets();
    NEEDS(m_desk->Unplug(side));
    ASSERT_TRUE(RunUntil([&] { return Told("error -203"); }));
    Run(1s);
    const std::size_t before = client.sink.FrameCount();
    for (int i = 0; i < 4; ++i)
        Run(200ms);
    EXPECT_EQ(client.sink.FrameCount(), before) << "there is nothing to show";
    EXPECT_EQ(client->GetCaptureStatus(), SHARE_CAPTURE_ENGINE_STATUS_STARTED);

    NEEDS(m_desk->PlugInAgain(side));
    // A frame has no pixels as long as the capturer hasn't been told that its display has a size again.
    ASSERT_TRUE(
        RunUntil([&] { return client.sink.FrameCount() > before && client.Last().Size() != TVLSize{}; }));
    EXPECT_EQ(client.Last().Size(), SIDE_SIZE);
    EXPECT_EQ(client.Last().meta.rectCapture, SideRect(100, 60));
    EXPECT_EQ(client.Last().Count(RED), 0) << "wherever the windows are meanwhile";
    PutWindowsBack();
    EXPECT_TRUE(RunUntilCount(BLUE, 100 * 60 - 40 * 20));
    ExpectNoSecrets();
    EXPECT_EQ(client.sink.CountNotices("error -203"), 1u);
    EXPECT_EQ(client.Statistic().nFlags, 0u) << "nothing that it would have to fall back from";
}

TEST_P(DesktopShare, SaysNothingOfAMonitorThatItDoesNotShare) {
    client.ShareMonitor(CGMainDisplayID());
    client.Start();
    ASSERT_TRUE(RunUntil([&] { return client.sink.FrameCount() > 0; }));
    NEEDS(m_desk->Unplug(side));
    m_desk->Settle();
    const std::size_t before = client.sink.FrameCount();
    EXPECT_TRUE(RunUntil([&] { return client.sink.FrameCount() > before + 3; }));
    EXPECT_EQ(client.sink.CountNotices("error -203"), 0u);
}

TEST_P(DesktopShare, FollowsTheResolutionOfItsMonitor) {
    ShareSideWithoutSecrets();
    NEEDS(m_desk->Resize(side, {80, 40}));
    EXPECT_TRUE(RunUntil([&] { return Told("size 80x40") && Told(SidePosition(80, 40)); }));
    EXPECT_TRUE(RunUntil([&] {
        return client.Last().Size() == TVLSize{80, 40} && client.Last().meta.rectCapture == SideRect(80, 40);
    }));
    ExpectNoSecrets();
    NEEDS(m_desk->Resize(side, {100, 60}));
    EXPECT_TRUE(RunUntilSize(SIDE_SIZE));
    EXPECT_TRUE(RunUntilCount(BLUE, 100 * 60 - 40 * 20));
    ExpectNoSecrets();
}

TEST_P(DesktopShare, OutlivesAWindowServerThatIsLostAndFound) {
    ShareSideWithoutSecrets();
    NEEDS(m_desk->Lose());
    ASSERT_TRUE(RunUntil([&] { return Told("error -203"); }));
    Run(1s);
    const std::size_t before = client.sink.FrameCount();
    NEEDS(m_desk->FindAgain());
    OpenWindowsAgain();
    EXPECT_TRUE(RunUntil([&] {
        return client.sink.FrameCount() > before && client.Last().Count(GREEN) == 40 * 20 &&
               client.Last().Count(RED) == 0;
    }));
    EXPECT_EQ(client.Last().Size(), SIDE_SIZE);
    ExpectNoSecrets();
    EXPECT_FALSE(client->IsWindowShared(secretWindow));
    EXPECT_FALSE(client->IsWindowShared(secretOfEditor));
    EXPECT_TRUE(client->IsWindowShared(editorWindow));
}

// ---- What its client does

TEST_P(DesktopShare, GivesNoFrameWhilePausedAndSoonAfterwardsOneWithoutWhatIsKeptOutSince) {
    client.ShareMonitor(side);
    client.Start();
    EXPECT_TRUE(RunUntilCount(RED, 30 * 20 + 10 * 10));
    EXPECT_EQ(client->Pause(), 0);
    EXPECT_TRUE(client.sink.WaitForNotice("status 3"));
    EndPass(*client);
    Run(200ms);
    const std::size_t before = client.sink.FrameCount();
    KeepSecrets();
    for (int i = 0; i < 10; ++i)
        Run(200ms);
    EXPECT_EQ(client.sink.FrameCount(), before);
    EXPECT_EQ(client->Resume(), 0);
    // The first frame may be the last one again: what is kept out changes what is seen, as a drag does.
    EXPECT_TRUE(RunUntil([&] { return client.sink.FrameCount() > before && client.Last().Count(RED) == 0; }));
    ExpectNoSecrets();
}

TEST_P(DesktopShare, MayBeStoppedAndStartedAgain) {
    ShareSideWithoutSecrets();
    EXPECT_EQ(client->Stop(), 0);
    const std::size_t before = client.sink.FrameCount();
    Run(1s);
    EXPECT_EQ(client.sink.FrameCount(), before);
    client.Start();
    EXPECT_TRUE(RunUntil([&] { return client.sink.FrameCount() > before; }));
    EXPECT_EQ(client.Last().Size(), SIDE_SIZE) << "of the same monitor";
    ExpectNoSecrets();
}

TEST_P(DesktopShare, HoldsEqualFramesBackUntilOneIsAskedFor) {
    client.ShareMonitor(side);
    KeepSecrets();
    bool isOn = true;
    EXPECT_EQ(client->Config(SHARE_CAPTURE_ENGINE_CONFIG_CHECK_DUP_FRAME, &isOn, sizeof(isOn)), 0);
    client.Start();
    ASSERT_TRUE(RunUntil([&] { return client.Statistic().nDuplicateFrames > 2; }));
    EXPECT_EQ(client->Config(SHARE_CAPTURE_ENGINE_CONFIG_FORCE_FRAME, &isOn, sizeof(isOn)), 0);
    const std::size_t before = client.sink.FrameCount();
    EXPECT_TRUE(RunUntil([&] { return client.sink.FrameCount() > before; }));
    ExpectNoSecrets();
}

INSTANTIATE_TEST_SUITE_P(Desks, DesktopShare, testing::ValuesIn(ShareDeskKinds()),
                         [](const auto& each) { return std::string(each.param.name); });
