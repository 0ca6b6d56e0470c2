// SPDX-License-Identifier: Apache-2.0
#include "tests/src/mac/followed_share_fixture.h"

// Shares of applications, on every kind of desktop. What hangs on exact times or on what no other desktop can
// be made to do is in application_share_edges_test.cpp.

using namespace platform;

namespace {

using namespace std::chrono_literals;

class ApplicationShare : public FollowedShare {
protected:
    ApplicationShare() : FollowedShare(SHARE_CAPTURE_ENGINE_TYPE_APP) {}

    int Share(pid_t pid) { return client->AddSharedProcess(static_cast<unsigned>(pid)); }

    /// From here on the picture is the main display with the editor on it.
    void ShareEditor() {
        EXPECT_EQ(Share(editor), 0);
        client.Start();
        ASSERT_TRUE(RunUntilShown(MainSize(), GREEN, TEXT_PIXELS));
    }
    std::optional<CGWindowID> OpenNotes() { return Open(editor, NotesFrame(), BLUE); }
};

} // namespace

// ---- What is seen

TEST_P(ApplicationShare, ShowsItsWindowsAndItsPopupWholeUnderWhatIsNotShared) {
    const auto notes = OpenNotes();
    NEEDS(notes);
    EXPECT_EQ(Share(editor), 0);
    // Over half of the text and half of the notes.
    CoverWithSecret(Rect(0, 0, 200, 40));
    if (IsSkipped())
        return;
    client.Start();
    ASSERT_TRUE(RunUntilShown(MainSize(), BLUE, NOTES_PIXELS));
    ExpectOnMain(TEXT_PIXELS, NOTES_PIXELS);
    EXPECT_EQ(client.Last().At(20, 20), Rgb(GREEN));
    EXPECT_EQ(client.Last().At(19, 20), Rgb(BACKGROUND));
    EXPECT_EQ(client.Last().At(159, 59), Rgb(BLUE));
    EXPECT_EQ(client.sink.Frames().back().update, MainRect());

    // In front of a part of the text and of nothing.
    NEEDS(OpenPopup(editor, Rect(60, 45, 40, 30), YELLOW));
    ASSERT_TRUE(RunUntilShown(MainSize(), YELLOW, 40 * 30));
    const DeliveredShot shot = client.Last();
    EXPECT_EQ(shot.meta.rectCapture, MainRect());
    EXPECT_EQ(shot.Count(GREEN), TEXT_PIXELS - 20 * 15);
    EXPECT_EQ(shot.Count(BLUE), NOTES_PIXELS);
    EXPECT_EQ(shot.Count(RED), 0);
    EXPECT_EQ(shot.Count(TEAL), 0);
    EXPECT_EQ(shot.Count(BACKGROUND),
              MainSize().cx * MainSize().cy - TEXT_PIXELS - NOTES_PIXELS - 40 * 30 + 20 * 15);
    EXPECT_EQ(shot.At(60, 45), Rgb(YELLOW));
    EXPECT_EQ(shot.At(99, 74), Rgb(YELLOW));
    EXPECT_EQ(shot.At(59, 45), Rgb(GREEN));
}

TEST_P(ApplicationShare, TellsWhereItIsAndHowLargeAndWhichWindowsItShows) {
    client->SetSink(&client.sink);
    EXPECT_EQ(Share(editor), 0);
    EXPECT_TRUE(client.sink.WaitForNotice(SizeNotice(MainSize())));
    EXPECT_TRUE(client.sink.WaitForNotice(PositionNotice(MainRect())));
    client.Start();
    EXPECT_TRUE(RunUntilTold("windows " + std::to_string(text) + ","));
    EXPECT_TRUE(client->IsAppShared(static_cast<unsigned>(editor)));
    EXPECT_TRUE(client->IsWindowShared(text));
    EXPECT_FALSE(client->IsAppShared(static_cast<unsigned>(secrets)));
}

TEST_P(ApplicationShare, BringsItsApplicationForward) {
    NEEDS(Open(secrets, TextFrame(), RED));
    EXPECT_EQ(Share(editor), 0);
    EXPECT_TRUE(RunUntil([&] {
        const auto windows = m_desk->Server().GetWindows();
        for (const WindowInfo& window : windows->Windows()) {
            if (window.owner == editor && window.id == text)
                return true;
            if (window.owner == secrets && window.frame == TextFrame())
                return false;
        }
        return false;
    }));
}

TEST_P(ApplicationShare, KeepsAWindowOfItsApplicationOut) {
    const auto notes = OpenNotes();
    NEEDS(notes);
    ShareEditor();
    EXPECT_EQ(client->AddUnSharedWindow(*notes), 0);
    ASSERT_TRUE(RunUntilShown(MainSize(), BLUE, 0));
    ExpectOnMain(TEXT_PIXELS);
    EXPECT_EQ(client->RemoveUnSharedWindow(*notes), 0);
    ASSERT_TRUE(RunUntilShown(MainSize(), BLUE, NOTES_PIXELS));
    ExpectOnMain(TEXT_PIXELS, NOTES_PIXELS);
}

TEST_P(ApplicationShare, RefusesToStartWithNothingToShare) {
    client->SetSink(&client.sink);
    EXPECT_EQ(client->Start(), -6);
    EXPECT_EQ(Share(editor), 0);
    client.Start();
    EXPECT_TRUE(RunUntilShown(MainSize(), GREEN, TEXT_PIXELS));
}

// ---- Displays

TEST_P(ApplicationShare, FollowsItsApplicationToTheOtherMonitorAndBack) {
    ShareEditor();
    FollowTheTextToTheSideAndBack();
}

TEST_P(ApplicationShare, TellsOfWindowsOnTwoMonitorsAfterASecond) {
    const auto notes = OpenNotes();
    NEEDS(notes);
    ShareEditor();
    TellOfNotesOnTheSide(*notes);
}

TEST_P(ApplicationShare, ComesBackWithTheMonitorThatWasUnplugged) {
    ShareEditor();
    LoseTheSideAndGetItBack();
}

TEST_P(ApplicationShare, BeginsOnTheMonitorThatItsApplicationIsOn) {
    Move(text, TextFrameOnSide());
    EXPECT_EQ(Share(editor), 0);
    client.Start();
    ASSERT_TRUE(RunUntil([&] { return client.sink.FrameCount() > 0; }));
    EXPECT_EQ(client.sink.Frames().front().size, SIDE_SIZE);
    ASSERT_TRUE(RunUntilShown(SIDE_SIZE, GREEN, TEXT_PIXELS));
    ExpectOnSide(TEXT_PIXELS);
}

// ---- What happens to it

TEST_P(ApplicationShare, TellsThatItsApplicationHasEndedAndSharesAnotherOne) {
    ShareEditor();
    NEEDS(m_desk->EndApplication(editor));
    ASSERT_TRUE(RunUntilTold(NO_APPLICATION));
    const std::size_t before = client.sink.FrameCount();
    EXPECT_TRUE(RunUntil([&] { return client.sink.CountNotices(NO_APPLICATION) > 2; }))
        << "it is told of at each pass";
    EXPECT_EQ(client.sink.FrameCount(), before) << "there is nothing to show";
    EXPECT_EQ(client->GetCaptureStatus(), SHARE_CAPTURE_ENGINE_STATUS_STARTED);
    EXPECT_FALSE(client->IsAppShared(static_cast<unsigned>(editor)));

    const auto writing = m_desk->StartApplication("Writer");
    NEEDS(writing);
    NEEDS(Open(*writing, NotesFrame(), BLUE));
    EXPECT_EQ(Share(*writing), 0);
    ASSERT_TRUE(RunUntilShown(MainSize(), BLUE, NOTES_PIXELS));
    ExpectOnMain(0, NOTES_PIXELS);
}

TEST_P(ApplicationShare, TellsThatItsApplicationWasTakenOff) {
    ShareEditor();
    EXPECT_EQ(client->RemoveSharedProcess(static_cast<unsigned>(editor)), 0);
    ASSERT_TRUE(RunUntilTold(NO_APPLICATION));
    EXPECT_EQ(Share(editor), 0);
    ASSERT_TRUE(RunUntilShown(MainSize(), GREEN, TEXT_PIXELS));
}

TEST_P(ApplicationShare, ShowsBackgroundWhileItsWindowIsMinimised) {
    ShareEditor();
    MinimiseAndRestoreTheText();
}

TEST_P(ApplicationShare, ShowsAWindowThatIsOpenedLater) {
    ShareEditor();
    NEEDS(OpenNotes());
    ASSERT_TRUE(RunUntilShown(MainSize(), BLUE, NOTES_PIXELS));
    ExpectOnMain(TEXT_PIXELS, NOTES_PIXELS);
}

INSTANTIATE_TEST_SUITE_P(Desks, ApplicationShare, testing::ValuesIn(ShareDeskKinds()),
                         [](const auto& each) { return std::string(each.param.name); });
