// SPDX-License-Identifier: Apache-2.0
#include "src/mac/avfoundation/share_capturer_session.h"
#include "tests/src/mac/avfoundation/session_bench.h"
#include "tests/support/forwarding_window_server.h"
#include "tests/support/memory_failure.h"

#include <atomic>
#include <chrono>
#include <functional>
#include <memory>
#include <string>
#include <utility>

// Which samples the back-ends of sessions look at, and what they paint over in either.

using namespace platform;

namespace {

class SessionPrivacy : public SessionBackEnd {};

/// Something is always to be seen on its displays that no snapshot lists, as a window that never paints
/// itself.
class CUntoldWindowServer final : public CForwardingWindowServer {
public:
    using CForwardingWindowServer::CForwardingWindowServer;

protected:
    platform::DisplayPictureResult TakeNewest(platform::DisplayStream& stream,
                                              std::chrono::nanoseconds deadline) override {
        platform::DisplayPictureResult result = CForwardingWindowServer::TakeNewest(stream, deadline);
        if (result.picture != nullptr) {
            auto picture = std::make_shared<platform::Picture>(*result.picture);
            picture->generationBefore = 0;
            result.picture = std::move(picture);
        }
        return result;
    }
};

/// Does something once, when a line with that text is traced, on the thread that traces it.
class CAtTrace {
public:
    CAtTrace(std::string text, std::function<void()> action)
        : m_text(std::move(text)),
          m_action(std::move(action)) {
        CmSetTraceThreshold(CM_TRACE_DETAIL);
        CmSetTraceReceiver(Receive, this);
    }
    ~CAtTrace() {
        CmSetTraceReceiver(nullptr, nullptr);
        CmSetTraceThreshold(m_thresholdBefore);
        EXPECT_TRUE(m_isDone);
    }
    CAtTrace(const CAtTrace&) = delete;
    CAtTrace& operator=(const CAtTrace&) = delete;

private:
    static void Receive(void* self, int, const char*, const char* text, int length) {
        auto& scope = *static_cast<CAtTrace*>(self);
        const std::string line(text, static_cast<std::size_t>(length));
        if (line.find(scope.m_text) != std::string::npos && !scope.m_isDone.exchange(true))
            scope.m_action();
    }

    const std::string m_text;
    const std::function<void()> m_action;
    const int m_thresholdBefore = CmGetTraceThreshold();
    std::atomic<bool> m_isDone{false};
};

} // namespace

// ---- Samples that may be looked at

TEST_P(SessionPrivacy, LooksAtNoSampleOfOtherWindowsThanItHasWalkedWhileSomethingIsKeptOut) {
    KeepSecretsOut();
    EXPECT_EQ(Show(), OK);
    Paint(TEXT, WHITE);
    Tick();
    Open(20, EDITOR, Rect(0, 0, 5, 5), TEAL); // the sample is older
    const CTraceLog trace;
    EXPECT_EQ(Pass(), FAILED);
    EXPECT_EQ(trace.LinesContaining("access image buffer failed").size(), 1u);
    EXPECT_EQ(Count(WHITE), 0);
    Tick();
    EXPECT_EQ(Pass(), OK) << "the next one is of these windows";
    EXPECT_EQ(Count(WHITE), kind.IsMix() ? TEXT_PIXELS : TEXT_PIXELS - TEXT_UNDER_SECRET);
    EXPECT_EQ(CountReddish(), 0);
}

TEST_P(SessionPrivacy, FailsWithoutABreakAsLongAsNobodyCanTellWhichWindowsItShows) {
    KeepSecretsOut();
    EXPECT_EQ(Show(), OK);
    {
        const CWindowServerScope untold(std::make_shared<CUntoldWindowServer>(CurrentWindowServer()));
        Tick();
        for (int pass = 0; pass < 20; ++pass) {
            EXPECT_EQ(Pass(), FAILED) << pass << ": no data would pass for a screen that stands still";
            AwaitSamples();
        }
    }
    Tick();
    Drain();
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(CountReddish(), 0);
}

TEST_P(SessionPrivacy, IsSmoothOnADesktopThatKeepsNothingOut) {
    Paint(TEXT, WHITE);
    Tick();
    Open(20, EDITOR, Rect(0, 0, 5, 5), TEAL);
    EXPECT_EQ(Pass(), OK);
    EXPECT_EQ(Count(WHITE), TEXT_PIXELS - TEXT_UNDER_SECRET);
    EXPECT_EQ(Count(TEAL), 0);
}

TEST_P(SessionPrivacy, LooksAtNoSampleOfOtherWindowsInAShareOfApplications) {
    ShareEditor();
    EXPECT_EQ(Show(), OK);
    Paint(TEXT, WHITE);
    Tick();
    Open(20, SECRETS, Rect(180, 100, 5, 5), RED);
    EXPECT_EQ(Pass(), FAILED);
}

TEST_P(SessionPrivacy, LooksAtNoSampleWhenTheDisplayWasElsewhere) {
    KeepSecretsOut();
    EXPECT_EQ(Show(), OK);
    Paint(TEXT, WHITE);
    Tick();
    context->AddSharedDisplay(SIDE); // the masks are for both now
    UntilRest();
    EXPECT_EQ(Pass(), FAILED);
    EXPECT_EQ(Count(WHITE), 0);
}

TEST_P(SessionPrivacy, LooksAtNoSampleWhenNoWindowsWereWalked) {
    KeepSecretsOut();
    settings->m_nShareConfigFlags = SHARE_CONFIG_FLAG_NO_WINDOW_WALK;
    EXPECT_EQ(Show(), FAILED);
    settings->m_nShareConfigFlags = 0;
    EXPECT_EQ(Show(), OK);
}

TEST_P(SessionPrivacy, LooksAtSamplesThatTheWalkFitsAfterADrag) {
    KeepSecretsOut();
    EXPECT_EQ(Show(), OK);
    for (int i = 0; i < 3; ++i) {
        desktop->MoveWindow(SECRET, {110 + static_cast<float>(i), 60});
        Tick();
        EXPECT_EQ(Pass(), DRAGGING);
    }
    Advance(ms(501));
    EXPECT_EQ(Pass(), DRAGGING) << "it has moved on meanwhile";
    Advance(ms(501));
    EXPECT_EQ(Pass(), OK) << "the last sample is of this";
    EXPECT_EQ(CountReddish(), 0);
}

TEST_P(SessionPrivacy, GivesNothingThatWasWithdrawnDuringThePass) {
    EXPECT_EQ(Show(), OK);
    script->Do(Operation::LockBaseAddress, [this] { context->AddUnSharedWindow(SECRET); });
    EXPECT_EQ(Show(), NO_DATA);
    UntilRest();
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(CountReddish(), 0);
}

TEST_P(SessionPrivacy, GivesNothingThatWasSeenBeforeAnInterruption) {
    Paint(TEXT, WHITE);
    Tick();
    Paint(TEXT, green);
    context->NoteInterruption();
    const unsigned starts = Starts();
    EXPECT_EQ(PassSoon(), OK);
    EXPECT_EQ(Starts(), starts + 1);
    EXPECT_EQ(Count(WHITE), 0);
    EXPECT_EQ(Count(green), TEXT_PIXELS - TEXT_UNDER_SECRET);
    EXPECT_EQ(Pass(), NO_DATA);
    EXPECT_EQ(Starts(), starts + 1) << "once";
}

TEST_P(SessionPrivacy, GivesNothingThatWasInterruptedDuringThePass) {
    script->Do(Operation::LockBaseAddress, [this] { context->NoteInterruption(); });
    EXPECT_EQ(Show(), NO_DATA);
    EXPECT_EQ(PassSoon(), OK);
}

TEST_P(SessionPrivacy, GivesNothingThatWasSeenBeforeItWasLetIn) {
    Open(20, SECRETS, Rect(0, 0, 5, 5), TEAL);
    context->AddUnSharedWindow(20);
    context->AddUnSharedWindow(SECRET);
    UntilRest();
    Drain();
    Paint(20, RED); // which nobody may see
    Tick();
    Paint(20, TEAL);
    context->RemoveUnSharedWindow(20);
    context->RemoveUnSharedWindow(SECRET);
    UntilRest();
    EXPECT_EQ(PassSoon(), OK);
    EXPECT_EQ(CountIn({0, 0, 5, 5}, TEAL), 5 * 5);
    EXPECT_EQ(Count(RED), SECRET_PIXELS);
}

TEST_P(SessionPrivacy, GivesNothingOfADisplayThatHasMovedDuringThePass) {
    EXPECT_EQ(Show(), OK);
    script->Do(Operation::LockBaseAddress, [this] {
        desktop->ResizeDisplay(MAIN, {160, 100});
        context->UpdateSharedDisplay(MAIN);
    });
    EXPECT_EQ(Show(), NO_DATA);
}

// ---- A session that is silent because nothing changes

TEST_P(SessionPrivacy, ShowsWithoutAnyChangeOnTheScreenWhatIsKeptOutByNow) {
    EXPECT_EQ(Show(), OK);
    ASSERT_EQ(Count(RED), SECRET_PIXELS);
    context->AddUnSharedApp(static_cast<unsigned>(SECRETS));
    UntilRest();
    EXPECT_EQ(PassSoon(), OK);
    EXPECT_EQ(CountReddish(), 0);
    context->RemoveUnSharedApp(static_cast<unsigned>(SECRETS));
    UntilRest();
    EXPECT_EQ(PassSoon(), OK) << "and what may be seen again";
    EXPECT_EQ(Count(RED), SECRET_PIXELS);
    const unsigned starts = Starts();
    for (int i = 0; i < 5; ++i) {
        Tick();
        EXPECT_EQ(Pass(), NO_DATA);
    }
    EXPECT_EQ(Starts(), starts) << "it has been shown";
}

TEST_P(SessionPrivacy, ShowsWithoutAnotherChangeWhatWasWithdrawnInMidPass) {
    script->Do(Operation::LockBaseAddress, [this] { context->AddUnSharedWindow(SECRET); });
    EXPECT_EQ(Show(), NO_DATA);
    UntilRest();
    EXPECT_EQ(PassSoon(), OK);
    EXPECT_EQ(CountReddish(), 0);
}

TEST_P(SessionPrivacy, ShowsWithoutAnotherChangeWhatASampleTooNewHasShown) {
    KeepSecretsOut();
    EXPECT_EQ(Show(), OK);
    const CAtTrace change("UpdateShareCapturerContext end <<", [this] {
        desktop->SetAlpha(TEXT, 0.0F);
        Tick();
    });
    EXPECT_EQ(Pass(), FAILED);
    EXPECT_EQ(PassSoon(), OK);
    EXPECT_EQ(Count(green), 0);
    EXPECT_EQ(Count(BLUE), kind.IsMix() ? ALL_PIXELS : ALL_PIXELS - SECRET_PIXELS);
    EXPECT_EQ(CountReddish(), 0);
}

// ---- What is painted over

TEST_P(SessionPrivacy, PaintsBlackWhatLiesOverNothingThatIsKept) {
    desktop->CloseWindow(WALLPAPER);
    UntilRest();
    KeepSecretsOut();
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(CountIn({130, 60, 160, 100}, BLACK), 30 * 40);
    EXPECT_EQ(CountIn({100, 80, 130, 100}, BLACK), 30 * 20);
    EXPECT_EQ(CountReddish(), 0);
    EXPECT_EQ(CountIn({50, 40, 100, 80}, green), 50 * 40) << "and nothing else";
}

TEST_P(SessionPrivacy, PaintsBlackWhatShinesThroughAKeptWindowOfADesktop) {
    KeepSecretsOut();
    Open(20, EDITOR, Rect(90, 50, 80, 60), TEAL); // covers the secret
    desktop->SetAlpha(20, 0.5F);
    Tick();
    UntilRest();
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(CountReddish(), 0);
    EXPECT_EQ(CountIn({100, 60, 160, 100}, BLACK), SECRET_PIXELS);
    EXPECT_NE(At(95, 95), Rgb(BLACK)) << "beside the secret it is as it is";
    desktop->SetAlpha(20, 1.0F);
    Tick();
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(CountIn({100, 60, 160, 100}, TEAL), SECRET_PIXELS) << "nothing shines through now";
}

TEST_P(SessionPrivacy, ShowsAKeptWindowOfAnApplicationAsItIsSeen) {
    ShareEditor();
    Open(20, EDITOR, Rect(90, 50, 80, 60), TEAL);
    desktop->SetAlpha(20, 0.5F);
    Tick();
    UntilRest();
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(CountIn({100, 60, 160, 100}, BLACK), 0);
    EXPECT_GT(CountReddish(), 0) << "what shines through is a part of it";
}

TEST_P(SessionPrivacy, PaintsBlackWhatStandsAboveAllWindowsOfAnApplication) {
    ShareEditor();
    Open(20, SECRETS, Rect(60, 45, 20, 10), RED, SIMULATED_LEVEL_DOCK);
    Tick();
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(CountIn({60, 45, 80, 55}, BLACK), 20 * 10);
    EXPECT_EQ(CountReddish(), 0);
    EXPECT_EQ(CountIn({50, 40, 60, 80}, green), 10 * 40);
}

TEST_P(SessionPrivacy, PaintsOverTheLastRowOfAPictureThatIsRoundedUp) {
    desktop->ResizeDisplay(MAIN, {200, 119});
    context->UpdateSharedDisplay(MAIN);
    EXPECT_EQ(backEnd->onScreenResolutionChanged(MAIN), 1);
    backEnd->setMaxSize({100, 60});
    desktop->SetFrame(SECRET, Rect(0, 0, 200, 119));
    desktop->RaiseWindow(TEXT);
    ShareEditor();
    EXPECT_EQ(Show(), OK);
    const TVLSize size = SizeOf(*frame.Get());
    ASSERT_EQ(size, (TVLSize{100, 60}));
    EXPECT_EQ(CountReddish(), 0);
    EXPECT_EQ(CountIn({0, size.cy - 1, size.cx, size.cy}, FILL), size.cx);
}

TEST_P(SessionPrivacy, PaintsBlackWhoseOwnerCannotBeTold) {
    KeepSecretsOut();
    int shown = 0;
    for (unsigned nth = 1; nth <= 60; ++nth) {
        const auto other = Make(); // its first walk is no drag, whatever it finds
        ASSERT_TRUE(other->init(context));
        AwaitSamples();
        desktop->FailNth(DesktopOperation::GetLife, nth);
        const unsigned code = other->captureToIShareFrame(frame.Get());
        desktop->Heal(DesktopOperation::GetLife);
        if (code != OK)
            continue;
        ++shown;
        ASSERT_EQ(CountReddish(), 0) << "call " << nth;
    }
    EXPECT_GT(shown, 20);
}

TEST_P(SessionPrivacy, ShowsNothingUnderneathWhoseOwnerCannotBeTold) {
    Open(20, SECRETS, Rect(110, 65, 30, 20), RED);
    desktop->RaiseWindow(SECRET); // which covers it: what is seen is the same whosever it is
    KeepSecretsOut();
    int shown = 0;
    for (unsigned nth = 1; nth <= 60; ++nth) {
        green ^= 1;
        Paint(TEXT, green);
        Tick();
        desktop->FailNth(DesktopOperation::GetLife, nth);
        const unsigned code = Pass();
        desktop->Heal(DesktopOperation::GetLife);
        if (code == OK) {
            ++shown;
            ASSERT_EQ(CountReddish(), 0) << "call " << nth;
        }
        for (int i = 0; i < 3; ++i) {
            Advance(ms(501));
            Pass();
        }
    }
    EXPECT_GT(shown, 20);
}

TEST_P(SessionPrivacy, PaintsBlackWhatHasComeToBeOfWhoIsKeptOut) {
    Open(20, EDITOR, Rect(0, 0, 20, 20), TEAL);
    KeepSecretsOut();
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(CountIn({0, 0, 20, 20}, TEAL), 20 * 20);
    script->Do(Operation::LockBaseAddress, [this] {
        desktop->SetOwner(20, SECRETS);
        clock->Advance(ms(101)); // the windows that were walked are not remembered any more
    });
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(CountIn({0, 0, 20, 20}, BLACK), 20 * 20);
}

namespace {

/// Finds an overlap that nobody knows.
class CContextWithoutShape final : public ShareCapturerContextMac {
public:
    int UpdateShareCapturerContext() override {
        isMemoryGone = true;
        TVLRegion none;
        m_rgnOverlap.CopyRgn(none);
        isMemoryGone = false;
        return 0;
    }
};

} // namespace

TEST_P(SessionPrivacy, PaintsAllBlackAndFailsWhenItDoesNotKnowWhatToHide) {
    const auto shapeless = std::make_shared<CContextWithoutShape>();
    shapeless->AddSharedDisplay(MAIN);
    const auto other = Make();
    ASSERT_TRUE(other->init(shapeless));
    AwaitSamples();
    EXPECT_EQ(other->captureToIShareFrame(frame.Get()), FAILED);
    EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{200, 120}));
    EXPECT_EQ(Count(BLACK), ALL_PIXELS);
}

INSTANTIATE_TEST_SUITE_P(BackEnds, SessionPrivacy, testing::Values(FLAT_BACK_END, MIX_BACK_END),
                         [](const auto& each) { return std::string(each.param.name); });
