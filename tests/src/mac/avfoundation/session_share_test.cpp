// SPDX-License-Identifier: Apache-2.0
#include "tests/src/mac/avfoundation/session_share_fixture.h"
#include "tests/support/trace_log.h"

#include <screenshare/share_engine.h>

// Shares in the modes of sessions from the client's first call to the pixels in its sink. What hangs on exact
// times or failures is in session_share_edges_test.cpp.

using namespace platform;

namespace {

using namespace std::chrono_literals;

class SessionDesktopShare : public SessionShare {
protected:
    SessionDesktopShare() : SessionShare(SHARE_CAPTURE_ENGINE_TYPE_DESKTOP) {}

    bool IsOfDesktop() const override { return true; }
    void ListTo(ShareCapturerContext& context) const override {
        context.SetShareType(SHARE_TYPE_DESKTOP);
        context.SetFilterSelf(true); // as the back-end did that the engine was made with
        context.AddSharedDisplay(shown);
        if (keepsSecrets)
            context.AddUnSharedApp(static_cast<unsigned>(secrets));
    }

    void ShareMain() {
        shown = CGMainDisplayID();
        client.ShareMonitor(shown);
        ExpectToSeeMain();
    }
    void ExpectToSeeMain() {
        ExpectToSeeNothing();
        ExpectToSee(Rect(0, 0, 200, 120), TEAL);
        ExpectToSeeText(GREEN);
    }
    /// What shows red from then on is a leak.
    void KeepSecrets() {
        EXPECT_EQ(client->AddUnSharedProcess(static_cast<unsigned>(secrets)), 0);
        keepsSecrets = true;
    }

    CGDirectDisplayID shown = 0;
    bool keepsSecrets = false;
};

class SessionApplicationShare : public SessionShare {
protected:
    SessionApplicationShare() : SessionShare(SHARE_CAPTURE_ENGINE_TYPE_APP) {}

    void ListTo(ShareCapturerContext& context) const override {
        context.AddSharedDisplay(CGMainDisplayID());
        context.AddSharedApp(static_cast<unsigned>(editor));
    }
    void ShareEditor() {
        EXPECT_EQ(client->AddSharedProcess(static_cast<unsigned>(editor)), 0);
        client.Start();
        ExpectToSeeText(GREEN);
        ASSERT_TRUE(RunUntilRight(MainSize()));
    }
};

class SessionWindowShare : public SessionShare {
protected:
    SessionWindowShare() : SessionShare(SHARE_CAPTURE_ENGINE_TYPE_WINDOW) {}

    void ListTo(ShareCapturerContext& context) const override {
        context.AddSharedDisplay(CGMainDisplayID());
        context.SetShareType(SHARE_TYPE_WINDOW);
        context.AddSharedWindow(text);
    }
    void ShareText() {
        EXPECT_EQ(client->AddSharedWindow(text), 0);
        client.Start();
        ExpectToSeeText(GREEN);
        ASSERT_TRUE(RunUntilRight(MainSize()));
    }
};

/// Where a window goes that lies over the share.
constexpr CGPoint PATH[] = {{60, 35}, {45, 10}, {0, 50}, {90, 90}};

} // namespace

// ---- A monitor

TEST_P(SessionDesktopShare, HidesWhatIsKeptOutWhereverItMoves) {
    CoverWithSecret(Rect(50, 30, 60, 40));
    if (IsSkipped())
        return;
    ShareMain();
    KeepSecrets();
    client.Start();
    ASSERT_TRUE(RunUntilRight(MainSize()));
    for (const CGPoint& place : PATH) {
        MoveSecretOverRepaintedText(place);
        ASSERT_TRUE(RunUntilRight(MainSize()));
    }
    EXPECT_EQ(RedSoFar(), 0);
}

TEST_P(SessionDesktopShare, HidesItInASmallerPictureToo) {
    CoverWithSecret(Rect(60, 40, 40, 40));
    if (IsSkipped())
        return;
    ShareMain();
    KeepSecrets();
    client.Start();
    ASSERT_TRUE(RunUntilRight(MainSize()));
    const TVLSize half{MainSize().cx / 2, MainSize().cy / 2};
    EXPECT_EQ(client->SetCaptureMaxFrameSize(static_cast<unsigned>(half.cx), static_cast<unsigned>(half.cy)),
              0);
    ASSERT_TRUE(RunUntilRight(half));
    EXPECT_EQ(RedSoFar(), 0);
}

TEST_P(SessionDesktopShare, TakesASecretOutAndBringsItBackThoughNothingElseChanges) {
    CoverWithSecret(Rect(50, 30, 60, 40));
    if (IsSkipped())
        return;
    ShareMain();
    client.Start();
    ASSERT_TRUE(RunUntilShown(MainSize(), RED, 60 * 40));
    KeepSecrets();
    ASSERT_TRUE(RunUntilRight(MainSize()));
    ForgetRed();
    Run(400ms);
    EXPECT_EQ(RedSoFar(), 0);
    EXPECT_EQ(client->RemoveUnSharedProcess(static_cast<unsigned>(secrets)), 0);
    keepsSecrets = false;
    ASSERT_TRUE(RunUntilShown(MainSize(), RED, 60 * 40));
}

TEST_P(SessionDesktopShare, ShowsNothingOfWhatWasThereDuringAPause) {
    ShareMain();
    client.Start();
    ASSERT_TRUE(RunUntilRight(MainSize()));
    EXPECT_EQ(client->Pause(), 0);
    EXPECT_TRUE(client.sink.WaitForNotice("status 3"));
    EndPass(*client);
    CoverWithSecret(Rect(50, 30, 60, 40));
    if (IsSkipped())
        return;
    Run(400ms);
    EXPECT_TRUE(m_desk->Close(secret));
    m_desk->Settle();
    const std::size_t before = client.sink.FrameCount();
    EXPECT_EQ(client->Resume(), 0);
    ASSERT_TRUE(RunUntil([&] { return client.sink.FrameCount() > before + 1; }));
    ASSERT_TRUE(RunUntilRight(MainSize()));
    EXPECT_EQ(RedSoFar(), 0);
}

TEST_P(SessionDesktopShare, ShowsAnotherMonitorWhenItIsSelectedAndFollowsItsSize) {
    NEEDS(Open(editor, Rect(left, 0, 100, 100), BLUE));
    ShareMain();
    client.Start();
    ASSERT_TRUE(RunUntilRight(MainSize()));
    EXPECT_EQ(client->SelectSharedDisplay(side), 0);
    shown = side;
    ExpectToSeeNothing();
    ExpectToSee(Rect(left, 0, 100, 100), BLUE);
    ASSERT_TRUE(RunUntilRight(SIDE_SIZE));

    NEEDS(m_desk->Resize(side, {80, 40}));
    ASSERT_TRUE(RunUntilRight({80, 40}));
    EXPECT_TRUE(RunUntilTold("size 80x40"));
    NEEDS(m_desk->Resize(side, {60, 100})); // upright
    ASSERT_TRUE(RunUntilRight({60, 100}));
    EXPECT_EQ(client->SetCaptureMaxFrameSize(50, 50), 0);
    ASSERT_TRUE(RunUntilRight({30, 50}));
    NEEDS(m_desk->Resize(side, {100, 60}));
    ASSERT_TRUE(RunUntilRight({50, 30}));

    EXPECT_EQ(client->SetCaptureMaxFrameSize(1920, 1080), 0);
    EXPECT_EQ(client->SelectSharedDisplay(CGMainDisplayID()), 0);
    shown = CGMainDisplayID();
    ExpectToSeeMain();
    ASSERT_TRUE(RunUntilRight(MainSize()));
}

TEST_P(SessionDesktopShare, ComesBackWithTheMonitorThatWasUnplugged) {
    const auto window = Open(editor, Rect(left, 0, 100, 60), BLUE);
    NEEDS(window);
    shown = side;
    client.ShareMonitor(side);
    client.Start();
    ExpectToSee(Rect(left, 0, 100, 60), BLUE);
    ASSERT_TRUE(RunUntilRight(SIDE_SIZE));
    NEEDS(m_desk->Unplug(side));
    ASSERT_TRUE(RunUntilTold(DISPLAY_GONE));
    Run(1s);
    EXPECT_EQ(client->GetCaptureStatus(), SHARE_CAPTURE_ENGINE_STATUS_STARTED);
    NEEDS(m_desk->PlugInAgain(side));
    m_desk->Settle();
    Move(*window, Rect(left, 0, 100, 60));
    ASSERT_TRUE(RunUntilRight(SIDE_SIZE));
}

TEST_P(SessionDesktopShare, HandsTheRateOfItsClientToTheSession) {
    ShareMain();
    const CTraceLog trace(CM_TRACE_INFO);
    client.Start();
    EXPECT_EQ(client->SetCaptureFps(20), 0);
    EXPECT_TRUE(trace.WaitUntilContains("[ShareAVFCapturer setFPS to ]20"));
    ASSERT_TRUE(RunUntilRight(MainSize()));
    EXPECT_TRUE(m_desk->Recolour(text, BLUE));
    ExpectToSeeText(BLUE);
    ASSERT_TRUE(RunUntilRight(MainSize()));
}

INSTANTIATE_TEST_SUITE_P(Desks, SessionDesktopShare, testing::ValuesIn(SessionShareDeskKinds()),
                         SessionShareDeskName);

// ---- An application

TEST_P(SessionApplicationShare, ShowsNothingOfAWindowThatMovesOverIt) {
    CoverWithSecret(Rect(50, 30, 60, 40));
    if (IsSkipped())
        return;
    ShareEditor();
    for (const CGPoint& place : PATH) {
        MoveSecretOverRepaintedText(place);
        ASSERT_TRUE(RunUntilRight(MainSize()));
    }
    EXPECT_EQ(RedSoFar(), 0);
}

TEST_P(SessionApplicationShare, FollowsItsApplicationToTheOtherMonitorAndBack) {
    ShareEditor();
    FollowTheTextToTheSideAndBack();
}

TEST_P(SessionApplicationShare, TellsOfWindowsOnTwoMonitorsAfterASecond) {
    const auto notes = Open(editor, NotesFrame(), BLUE);
    NEEDS(notes);
    ExpectToSee(NotesFrame(), BLUE);
    ShareEditor();
    TellOfNotesOnTheSide(*notes);
}

TEST_P(SessionApplicationShare, ComesBackWithTheMonitorThatWasUnplugged) {
    ShareEditor();
    LoseTheSideAndGetItBack();
}

TEST_P(SessionApplicationShare, ShowsBackgroundWhileItsWindowIsMinimised) {
    ShareEditor();
    MinimiseAndRestoreTheText();
}

INSTANTIATE_TEST_SUITE_P(Desks, SessionApplicationShare, testing::ValuesIn(SessionShareDeskKinds()),
                         SessionShareDeskName);

// ---- A window

TEST_P(SessionWindowShare, ShowsNothingOfAWindowThatMovesOverIt) {
    CoverWithSecret(Rect(50, 30, 60, 40));
    if (IsSkipped())
        return;
    ShareText();
    for (const CGPoint& place : PATH) {
        MoveSecretOverRepaintedText(place);
        ASSERT_TRUE(RunUntilRight(MainSize()));
    }
    EXPECT_EQ(RedSoFar(), 0);
}

TEST_P(SessionWindowShare, ShowsNothingOfAnotherWindowOfTheSameApplication) {
    const auto other = Open(editor, Rect(60, 40, 50, 50), RED);
    NEEDS(other);
    ShareText();
    EXPECT_TRUE(m_desk->Raise(*other));
    m_desk->Settle();
    ASSERT_TRUE(RunUntilRight(MainSize()));
    EXPECT_EQ(RedSoFar(), 0);
}

TEST_P(SessionWindowShare, FollowsItsWindowToTheOtherMonitorAndBack) {
    ShareText();
    FollowTheTextToTheSideAndBack();
}

TEST_P(SessionWindowShare, ComesBackWithTheMonitorThatWasUnplugged) {
    ShareText();
    LoseTheSideAndGetItBack();
}

TEST_P(SessionWindowShare, ShowsBackgroundWhileItsWindowIsMinimised) {
    ShareText();
    MinimiseAndRestoreTheText();
}

INSTANTIATE_TEST_SUITE_P(Desks, SessionWindowShare, testing::ValuesIn(SessionShareDeskKinds()),
                         SessionShareDeskName);
