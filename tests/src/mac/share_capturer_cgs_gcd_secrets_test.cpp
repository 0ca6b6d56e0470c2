// SPDX-License-Identifier: Apache-2.0
#include "tests/src/mac/queued_backend_bench.h"

#include <gtest/gtest.h>

#include <vector>

// What is withdrawn from a share while pictures are on their way: what must not be seen by now is pure red,
// and nothing else has any red.

using namespace platform;

namespace {

class QueuedSecrets : public QueuedBackEnd {
protected:
    static constexpr CGWindowID SECRET_WINDOW = 2;

    /// In front of the editor's window.
    void OpenSecret(CGRect place) {
        SimulatedWindow window;
        window.info.id = SECRET_WINDOW;
        window.info.owner = NOTES;
        window.info.frame = place;
        window.info.onScreen = true;
        window.content = SimulatedContent::Colour(RED);
        ApplicationInfo notes;
        notes.pid = NOTES;
        notes.name = "Notes";
        desktop->StartApplication(notes);
        desktop->AddWindow(window);
    }
    /// Whether a frame has any red.
    bool HasRed() {
        const TVLSize size = SizeOf(*frame.Get());
        for (int y = 0; y < size.cy; ++y) {
            for (int x = 0; x < size.cx; ++x) {
                if (PixelAt(*frame.Get(), x, y).rgb >> 16 != 0)
                    return true;
            }
        }
        return false;
    }
    /// The next picture that is handed over shows none of it; the one at hand isn't.
    void ExpectGone() {
        EXPECT_EQ(Tick(), NOT_READY);
        ASSERT_TRUE(Settles());
        EXPECT_EQ(Tick(), OK);
        EXPECT_FALSE(HasRed());
    }

    static constexpr CGRect BESIDE{{5, 5}, {20, 20}};
};

} // namespace

TEST_F(QueuedSecrets, AreThereBeforeTheyAreWithdrawn) {
    OpenSecret(BESIDE);
    FinishPictures(1);
    EXPECT_EQ(Tick(), OK);
    EXPECT_TRUE(HasRed());
}

TEST_F(QueuedSecrets, AreNotShownFromBeforeTheirWindowWasKeptOut) {
    OpenSecret(BESIDE);
    FinishPictures(3);
    context->AddUnSharedWindow(SECRET_WINDOW);
    ExpectGone();
}

TEST_F(QueuedSecrets, AreNotShownFromBeforeAnInterruptionInWhichTheyCameAndWent) {
    CClog clog;
    EXPECT_EQ(Tick(), NOT_READY); // begun, and taken once the share is paused
    OpenSecret(BESIDE);
    clog.Open();
    ASSERT_TRUE(Settles());
    desktop->CloseWindow(SECRET_WINDOW);
    context->NoteInterruption();
    ExpectGone();
}

TEST_F(QueuedSecrets, AreNotShownFromBeforeTheirApplicationWasKeptOut) {
    OpenSecret(BESIDE);
    FinishPictures(3);
    context->AddUnSharedApp(static_cast<unsigned>(NOTES));
    ExpectGone();
}

TEST_F(QueuedSecrets, AreNotShownByACaptureThatWasOnItsWay) {
    OpenSecret(BESIDE);
    BeginPicture(300);
    context->AddUnSharedWindow(SECRET_WINDOW);
    Advance(300);
    ASSERT_TRUE(Settles());
    ExpectGone();
}

TEST_F(QueuedSecrets, AreNotShownOfADisplayThatIsNoLongerShared) {
    OpenSecret(BESIDE);
    context->AddSharedDisplay(MAIN);
    FinishPictures(2);
    context->AddUnSharedApp(static_cast<unsigned>(NOTES));
    context->RemoveUnSharedApp(static_cast<unsigned>(NOTES));
    context->RemoveSharedDisplay(MAIN);
    EXPECT_EQ(Tick(), NOT_READY);
}

TEST_F(QueuedSecrets, AreNotShownFromBeforeTheShareBecameOneOfAnApplication) {
    OpenSecret(BESIDE);
    FinishPictures(3);
    ShareApp();
    ExpectGone();
    EXPECT_EQ(CountOf(*frame.Get(), 3), 80 * 40);
}

// The window in front lets it shine through and covers all of it, so nothing that is seen moves when it goes.
TEST_F(QueuedSecrets, AreNotShownByTheListsOfAWalkFromBeforeTheyWereWithdrawn) {
    OpenSecret({{50, 40}, {80, 40}});
    desktop->LowerWindow(SECRET_WINDOW);
    desktop->SetAlpha(EDITOR_WINDOW, 0.5F);
    ShareApp();
    context->AddSharedApp(static_cast<unsigned>(NOTES));
    {
        CClog clog;
        EXPECT_EQ(Tick(), NOT_READY); // walks; the capture waits
        context->RemoveSharedApp(static_cast<unsigned>(NOTES));
    }
    ASSERT_TRUE(Settles());
    ExpectGone();
}

TEST_F(QueuedSecrets, AreNotShownWhenTheyAreWithdrawnInTheMiddleOfAWalk) {
    OpenSecret({{50, 40}, {80, 40}});
    desktop->LowerWindow(SECRET_WINDOW);
    desktop->SetAlpha(EDITOR_WINDOW, 0.5F);
    ShareApp();
    context->AddSharedApp(static_cast<unsigned>(NOTES));
    unsigned lookUps = 0;
    {
        CClog clog;
        const unsigned before = desktop->CallsOf(Operation::GetLife);
        Tick();
        lookUps = desktop->CallsOf(Operation::GetLife) - before;
        ASSERT_GT(lookUps, 2u);
    }
    ASSERT_TRUE(Settles());
    CClog clog;
    desktop->SetTitle(EDITOR_WINDOW, "so that there is a walk");
    // The last look-up of a walk comes when its verdicts on windows are made.
    desktop->DoAt(Operation::GetLife, lookUps,
                  [this] { context->RemoveSharedApp(static_cast<unsigned>(NOTES)); });
    EXPECT_EQ(Tick(), NOT_READY) << "what was finished before is withdrawn, too";
    EXPECT_EQ(context->GetSharedAppCount(), 1) << "it was in this walk";
    std::vector<unsigned> walked;
    context->GetCapturedWindows(walked);
    ASSERT_EQ(walked.size(), 2u) << "it came behind the verdict";
    clog.Open();
    ASSERT_TRUE(Settles());
    ExpectGone();
}

TEST_F(QueuedSecrets, AreShownAgainWhenTheyAreNoLongerKeptOut) {
    OpenSecret(BESIDE);
    context->AddUnSharedWindow(SECRET_WINDOW);
    FinishPictures(1);
    context->RemoveUnSharedWindow(SECRET_WINDOW);
    EXPECT_EQ(Tick(), OK) << "what hid more than needed is as good";
    EXPECT_FALSE(HasRed());
    ASSERT_TRUE(Settles());
    EXPECT_EQ(Tick(), OK);
    EXPECT_TRUE(HasRed());
}
