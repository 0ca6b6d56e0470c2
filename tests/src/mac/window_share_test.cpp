// SPDX-License-Identifier: Apache-2.0
#include "tests/src/mac/followed_share_fixture.h"

// Shares of single windows, on every kind of desktop.

using namespace platform;

namespace {

using namespace std::chrono_literals;

class WindowShare : public FollowedShare {
protected:
    WindowShare() : FollowedShare(SHARE_CAPTURE_ENGINE_TYPE_WINDOW) {}

    /// From here on the picture is the main display with the text on it.
    void ShareText() {
        EXPECT_EQ(client->AddSharedWindow(text), 0);
        client.Start();
        ASSERT_TRUE(RunUntilShown(MainSize(), GREEN, TEXT_PIXELS));
    }
    /// The editor's second window, shared as well.
    std::optional<CGWindowID> ShareNotes() {
        const auto notes = Open(editor, NotesFrame(), BLUE);
        if (notes) {
            EXPECT_EQ(client->AddSharedWindow(*notes), 0);
        }
        return notes;
    }
};

} // namespace

// ---- What is seen

TEST_P(WindowShare, ShowsACoveredWindowWholeAndNothingElse) {
    NEEDS(Open(editor, NotesFrame(), BLUE)); // of the same application
    CoverWithSecret(Rect(10, 10, 100, 60));
    if (IsSkipped())
        return;
    ShareText();
    ExpectOnMain(TEXT_PIXELS);
    EXPECT_EQ(client.Last().At(20, 20), Rgb(GREEN));
    EXPECT_EQ(client.Last().At(79, 59), Rgb(GREEN));
    EXPECT_EQ(client.Last().At(80, 59), Rgb(BACKGROUND));
    EXPECT_EQ(client.sink.Frames().back().update, MainRect());
    EXPECT_TRUE(RunUntilTold("windows " + std::to_string(text) + ","));
    EXPECT_FALSE(client->IsWindowShared(secret));
    EXPECT_TRUE(client->IsWindowShared(text));
}

TEST_P(WindowShare, TellsWhereItIsAndHowLarge) {
    client->SetSink(&client.sink);
    Move(text, TextFrameOnSide());
    EXPECT_EQ(client->AddSharedWindow(text), 0);
    EXPECT_TRUE(client.sink.WaitForNotice(SizeNotice(SIDE_SIZE)));
    EXPECT_TRUE(client.sink.WaitForNotice(PositionNotice(SideRect())));
    client.Start();
    ASSERT_TRUE(RunUntil([&] { return client.sink.FrameCount() > 0; }));
    EXPECT_EQ(client.sink.Frames().front().size, SIDE_SIZE);
}

TEST_P(WindowShare, ShowsAndHidesWindowsWhileItRuns) {
    ShareText();
    const auto notes = ShareNotes();
    NEEDS(notes);
    ASSERT_TRUE(RunUntilShown(MainSize(), BLUE, NOTES_PIXELS));
    ExpectOnMain(TEXT_PIXELS, NOTES_PIXELS);
    EXPECT_EQ(client->RemoveSharedWindow(text), 0);
    ASSERT_TRUE(RunUntilShown(MainSize(), GREEN, 0));
    ExpectOnMain(0, NOTES_PIXELS);
}

TEST_P(WindowShare, RefusesToStartWithNothingToShare) {
    client->SetSink(&client.sink);
    EXPECT_EQ(client->Start(), -6);
    EXPECT_EQ(client->AddSharedWindow(0), -2);
    EXPECT_EQ(client->Start(), -6);
    ShareText();
}

TEST_P(WindowShare, FitsIntoTheLimitOfItsClient) {
    ShareText();
    const TVLSize half{MainSize().cx / 2, MainSize().cy / 2};
    EXPECT_EQ(client->SetCaptureMaxFrameSize(static_cast<unsigned>(half.cx), static_cast<unsigned>(half.cy)),
              0);
    ASSERT_TRUE(RunUntilShown(half, GREEN, TEXT_PIXELS / 4));
    EXPECT_EQ(client.Last().meta.rectCapture, MainRect()) << "the same, only smaller";
}

// ---- Displays

TEST_P(WindowShare, FollowsItsWindowToTheOtherMonitorAndBack) {
    ShareText();
    FollowTheTextToTheSideAndBack();
}

TEST_P(WindowShare, TellsOfWindowsOnTwoMonitorsAfterASecond) {
    ShareText();
    const auto notes = ShareNotes();
    NEEDS(notes);
    ASSERT_TRUE(RunUntilShown(MainSize(), BLUE, NOTES_PIXELS));
    TellOfNotesOnTheSide(*notes);
}

TEST_P(WindowShare, ComesBackWithTheMonitorThatWasUnplugged) {
    ShareText();
    LoseTheSideAndGetItBack();
}

// ---- What happens to it

TEST_P(WindowShare, ShowsBackgroundWhileItsWindowIsMinimised) {
    ShareText();
    MinimiseAndRestoreTheText();
}

TEST_P(WindowShare, ShowsBackgroundOnceItsApplicationHasEnded) {
    ShareText();
    NEEDS(m_desk->EndApplication(editor));
    ASSERT_TRUE(RunUntilShown(MainSize(), BACKGROUND, MainSize().cx * MainSize().cy));
    ExpectOnMain(0);
    Run(1s);
    EXPECT_FALSE(Told(NO_APPLICATION));
    EXPECT_EQ(client->GetCaptureStatus(), SHARE_CAPTURE_ENGINE_STATUS_STARTED);
}

TEST_P(WindowShare, DoesNotShowWhatItsApplicationOpensLater) {
    ShareText();
    NEEDS(Open(editor, NotesFrame(), RED));
    Move(text, Rect(30, 25, 60, 40)); // tells that it has looked again
    ASSERT_TRUE(RunUntil([&] { return client.Last().At(89, 64) == Rgb(GREEN); }));
    ExpectOnMain(TEXT_PIXELS);
}

INSTANTIATE_TEST_SUITE_P(Desks, WindowShare, testing::ValuesIn(ShareDeskKinds()),
                         [](const auto& each) { return std::string(each.param.name); });
