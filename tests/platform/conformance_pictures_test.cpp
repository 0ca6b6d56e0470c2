// SPDX-License-Identifier: Apache-2.0
#include "tests/platform/conformance_fixture.h"

/// The contract of window pictures and display streams.

namespace {

using namespace platform;

class PictureContract : public WindowServerContract {
protected:
    static std::vector<CGWindowID> LayersOf(const WindowPicture& picture) {
        std::vector<CGWindowID> ids;
        for (const PictureLayer& layer : picture.layers)
            ids.push_back(layer.window);
        return ids;
    }
};

class StreamContract : public PictureContract {
protected:
    /// Reads until there is nothing more, and nothing that was told is left in the log.
    bool ReadsAll(DisplayStream& stream) {
        return Eventually([&] {
            m_log->Clear();
            return stream.TakeNewest(SoonEnough()).outcome == PictureOutcome::Nothing &&
                   m_log->Count(CNoticeLog::OfStream(stream.Id())) == 0;
        });
    }

    /// Reads until the picture is one of the stack in force, and gives that; null when it never is.
    PicturePtr ReadUntilItShowsTheStack(DisplayStream& stream, StreamCopy& copy) {
        PicturePtr shown;
        EXPECT_TRUE(Eventually([&] {
            const PicturePtr picture = stream.TakeNewest(SoonEnough()).picture;
            if (picture == nullptr)
                return false;
            EXPECT_TRUE(IsLawful(*picture));
            EXPECT_TRUE(copy.Take(*picture));
            const bool shows = picture->generationBefore == picture->generationAfter &&
                               picture->generationAfter == Server().GetWindows()->Generation();
            shown = shows ? picture : nullptr;
            return shows;
        }));
        return shown;
    }
};

constexpr std::uint32_t GREEN = 0x00FF00;
constexpr std::uint32_t BLUE = 0x0000FF;
constexpr std::uint32_t RED = 0xFF0000;
const CGRect FRAME{{20, 20}, {60, 40}};
const CGPoint INSIDE{40, 40};

} // namespace

FOR_EACH_WINDOW_SERVER(PictureContract);
FOR_EACH_WINDOW_SERVER(StreamContract);

// ---- Pictures of windows

TEST_P(PictureContract, ShowsAWindowWholeThatAnotherOneCovers) {
    const auto window = AddWindow(FRAME, GREEN);
    NEEDS(window);
    const auto cover = AddWindow(FRAME, RED);
    NEEDS(cover);
    ASSERT_NE(TakeWhenShown(*cover, RED), nullptr);
    const auto picture = TakeWhenShown(*window, GREEN);
    ASSERT_NE(picture, nullptr);
    EXPECT_EQ(picture->layers[0].frame, FRAME);
    EXPECT_EQ(picture->layers[0].alpha, 1.0F);
    EXPECT_FALSE(picture->layers[0].stale);
}

TEST_P(PictureContract, StacksItsLayersFromBackToFrontWhateverTheOrderOfTheQuestion) {
    const auto back = AddWindow(FRAME, GREEN);
    NEEDS(back);
    const auto middle = AddWindow(FRAME, RED);
    NEEDS(middle);
    const auto front = AddWindow(FRAME, BLUE);
    NEEDS(front);
    ASSERT_NE(TakeWhenShown(*back, GREEN), nullptr);
    ASSERT_NE(TakeWhenShown(*front, BLUE), nullptr);
    const CGWindowID unknown = *front + 1000;
    for (const auto& windows :
         {std::vector{*back, *front}, {*front, *back}, {*front, unknown, *back, *front, 0U}}) {
        const auto picture = Take(RequestFor(windows)).picture;
        ASSERT_NE(picture, nullptr);
        EXPECT_EQ(LayersOf(*picture), (std::vector{*back, *front}));
    }
    NEEDS(m_desk->Raise(*back));
    EXPECT_TRUE(Eventually([&] {
        const auto picture = Take(RequestFor({*back, *front})).picture;
        return picture != nullptr && LayersOf(*picture) == std::vector{*front, *back};
    }));
}

TEST_P(PictureContract, NeverShowsAWindowThatIsNotShared) {
    const auto window = AddWindow(FRAME, GREEN);
    NEEDS(window);
    const auto secret = AddWindow(FRAME, RED);
    NEEDS(secret);
    ASSERT_NE(TakeWhenShown(*secret, RED), nullptr);
    NEEDS(m_desk->Unshare(*secret));
    ASSERT_TRUE(Eventually([&] { return Listed(*secret).sharing == SharingState::None; }));
    const auto both = Take(RequestFor({*window, *secret})).picture;
    ASSERT_NE(both, nullptr);
    EXPECT_EQ(LayersOf(*both), std::vector{*window});
    EXPECT_TRUE(Shows(*both->layers[0].picture, GREEN));
    const auto alone = Take(RequestFor({*secret}));
    EXPECT_TRUE(alone.picture == nullptr || alone.picture->layers.empty());
    const auto stream = Open(MainDisplay());
    NEEDS(stream);
    const PicturePtr seen = Next(*stream);
    ASSERT_NE(seen, nullptr);
    for (const std::uint32_t pixel : PixelsOf(*seen))
        ASSERT_NE(pixel, 0xFF000000U | RED);
}

TEST_P(PictureContract, SaysGoneWhenNoneOfTheWindowsExists) {
    const auto window = AddWindow(FRAME, GREEN);
    NEEDS(window);
    EXPECT_EQ(Take(RequestFor({*window + 1000})).outcome, PictureOutcome::Gone);
    NEEDS(m_desk->Close(*window));
    EXPECT_TRUE(Eventually([&] { return Take(RequestFor({*window})).outcome == PictureOutcome::Gone; }));
}

TEST_P(PictureContract, SaysTimeoutForADeadlineThatHasPassedAndGoesOn) {
    const auto window = AddWindow(FRAME, GREEN);
    NEEDS(window);
    WindowPictureRequest request = RequestFor({*window});
    for (const auto deadline : {std::chrono::nanoseconds(0), CmSteadyNow()}) {
        request.deadline = deadline;
        const WindowPictureResult late = Server().TakeWindowPicture(request);
        EXPECT_EQ(late.outcome, PictureOutcome::Timeout);
        EXPECT_EQ(late.picture, nullptr);
    }
    EXPECT_NE(TakeWhenShown(*window, GREEN), nullptr);
    EXPECT_EQ(Server().GetLife().life, Life::Alive);
}

TEST_P(PictureContract, GivesTheSamePictureAsLongAsThePixelsAreTheSame) {
    const auto window = AddWindow(FRAME, GREEN);
    NEEDS(window);
    const auto cover = AddWindow(FRAME, RED);
    NEEDS(cover);
    const auto first = TakeWhenShown(*window, GREEN);
    ASSERT_NE(first, nullptr);
    NEEDS(m_desk->SetFrame(*window, {{30, 10}, {60, 40}}));
    NEEDS(m_desk->Raise(*window));
    ASSERT_TRUE(Eventually([&] { return Listed(*window).frame.origin == CGPoint{30, 10}; }));
    const auto moved = TakeWhenShown(*window, GREEN);
    ASSERT_NE(moved, nullptr);
    EXPECT_EQ(moved->layers[0].picture, first->layers[0].picture);
    EXPECT_EQ(moved->layers[0].frame.origin, (CGPoint{30, 10}));
    EXPECT_EQ(first->layers[0].frame, FRAME) << "a picture that was given out has changed";
    NEEDS(m_desk->Recolour(*window, BLUE));
    const auto recoloured = TakeWhenShown(*window, BLUE);
    ASSERT_NE(recoloured, nullptr);
    EXPECT_NE(recoloured->layers[0].picture, first->layers[0].picture);
    EXPECT_TRUE(Shows(*first->layers[0].picture, GREEN)) << "a picture that was given out has changed";
}

TEST_P(PictureContract, FollowsTheSizeOfAWindow) {
    const auto window = AddWindow(FRAME, GREEN);
    NEEDS(window);
    ASSERT_NE(TakeWhenShown(*window, GREEN), nullptr);
    const CGRect larger{{20, 20}, {80, 50}};
    NEEDS(m_desk->SetFrame(*window, larger));
    EXPECT_TRUE(Eventually([&] {
        const auto picture = Take(RequestFor({*window})).picture;
        return picture != nullptr && picture->layers.size() == 1 && picture->layers[0].frame == larger &&
               picture->layers[0].picture->rect.size == larger.size &&
               Shows(*picture->layers[0].picture, GREEN);
    }));
}

TEST_P(PictureContract, MarksThePictureOfAMinimisedWindowStale) {
    const auto window = AddWindow(FRAME, GREEN);
    NEEDS(window);
    ASSERT_NE(TakeWhenShown(*window, GREEN), nullptr);
    NEEDS(m_desk->Minimise(*window));
    ASSERT_TRUE(Eventually([&] { return !Listed(*window).onScreen; }));
    const WindowPictureResult result = Take(RequestFor({*window}));
    ASSERT_EQ(result.outcome, PictureOutcome::Ok);
    for (const PictureLayer& layer : result.picture->layers) {
        EXPECT_TRUE(layer.stale);
        EXPECT_TRUE(Shows(*layer.picture, GREEN));
    }
}

TEST_P(PictureContract, GivesPicturesThatOutliveIt) {
    const auto window = AddWindow(FRAME, GREEN);
    NEEDS(window);
    const auto picture = TakeWhenShown(*window, GREEN);
    ASSERT_NE(picture, nullptr);
    const auto snapshot = Server().GetWindows();
    const auto displays = Server().GetDisplays();
    const auto cursor = Server().GetCursor();
    m_desk->Release().reset();
    EXPECT_TRUE(Shows(*picture->layers[0].picture, GREEN));
    EXPECT_NE(snapshot->Find(*window), nullptr);
    EXPECT_TRUE(IsLawful(*displays));
    if (cursor != nullptr) {
        EXPECT_FALSE(PixelsOf(*cursor->representations[0]).empty());
    }
}

TEST_P(PictureContract, ShowsDisplaysWhereNoWindowsCanBeListedAndOnlyIfNothingIsKeptOut) {
    const auto window = AddWindow(FRAME, GREEN);
    NEEDS(window);
    NEEDS(m_desk->ListNoWindows());
    const auto isNoWindow = [&] { return Server().GetWindows()->Find(*window) == nullptr; };
    ASSERT_TRUE(Eventually(isNoWindow));
    EXPECT_EQ(Server().GetCapability(Capability::Windows), Availability::No);
    const auto snapshot = Server().GetWindows();
    ASSERT_EQ(snapshot->Windows().size(), Server().GetDisplays()->size());
    const WindowInfo& display = snapshot->Windows()[0];
    EXPECT_EQ(display.owner, 0);
    EXPECT_LT(display.level, 0);
    EXPECT_EQ(display.frame, Server().GetDisplays()->front().bounds);
    EXPECT_EQ(Take(RequestFor({display.id})).outcome, PictureOutcome::Unsupported);
    WindowPictureRequest request = RequestFor({display.id});
    request.keepsOut = false;
    const auto picture = Take(request).picture;
    ASSERT_NE(picture, nullptr);
    ASSERT_EQ(picture->layers.size(), 1u);
    EXPECT_EQ(ArgbAtPoint(*picture->layers[0].picture, INSIDE), 0xFF000000U | GREEN);
}

// ---- Streams

TEST_P(StreamContract, ShowsADisplayAsItIsSeenAndThenNothing) {
    const auto window = AddWindow(FRAME, GREEN);
    NEEDS(window);
    ASSERT_NE(TakeWhenShown(*window, GREEN), nullptr);
    const auto stream = Open(MainDisplay());
    NEEDS(stream);
    const PicturePtr first = Next(*stream);
    ASSERT_NE(first, nullptr);
    EXPECT_EQ(first->changed, (std::vector<PixelRect>{{0, 0, first->width, first->height}}));
    EXPECT_EQ(first->rect, ListedDisplay(MainDisplay())->bounds);
    EXPECT_LE(first->generationBefore, first->generationAfter);
    if (ArgbAtPoint(*first, INSIDE) != (0xFF000000U | GREEN)) {
        EXPECT_TRUE(ReadUntil(*stream, INSIDE, GREEN));
    }
    EXPECT_TRUE(
        Eventually([&] { return stream->TakeNewest(SoonEnough()).outcome == PictureOutcome::Nothing; }));
    NEEDS(m_desk->Recolour(*window, BLUE));
    EXPECT_TRUE(ReadUntil(*stream, INSIDE, BLUE));
}

TEST_P(StreamContract, TellsEachReaderAllThatIsDifferentForIt) {
    const auto window = AddWindow(FRAME, GREEN);
    NEEDS(window);
    const auto often = Open(MainDisplay());
    const auto seldom = Open(MainDisplay());
    NEEDS(often && seldom);
    StreamCopy copyOften;
    StreamCopy copySeldom;
    ASSERT_TRUE(copySeldom.Take(*Next(*seldom)));
    for (int i = 0; i < 10; ++i) {
        const auto shift = static_cast<float>(5 * i);
        NEEDS(m_desk->SetFrame(*window, {{20 + shift, 20 + shift}, {60, 40}}));
        NEEDS(m_desk->Recolour(*window, i % 2 == 0 ? BLUE : GREEN));
        m_desk->Settle();
        EXPECT_TRUE(copyOften.Take(*Next(*often)));
    }
    EXPECT_TRUE(copySeldom.Take(*Next(*seldom)));
}

TEST_P(StreamContract, TellsTheGenerationsOfAPictureThatStandsStill) {
    const auto window = AddWindow(FRAME, GREEN);
    NEEDS(window);
    const auto apart = AddWindow({{100, 20}, {60, 40}}, BLUE);
    NEEDS(apart);
    m_desk->Settle();
    const auto stream = Open(MainDisplay());
    NEEDS(stream);
    StreamCopy copy;
    const PicturePtr before = ReadUntilItShowsTheStack(*stream, copy);
    ASSERT_NE(before, nullptr);
    NEEDS(m_desk->Raise(*window));
    const auto hasGrown = [&] { return Server().GetWindows()->Generation() > before->generationAfter; };
    ASSERT_TRUE(Eventually(hasGrown));
    const PicturePtr after = ReadUntilItShowsTheStack(*stream, copy);
    ASSERT_NE(after, nullptr) << "who had an older picture keeps that for ever";
    EXPECT_GT(after->generationBefore, before->generationAfter);
    // What a window manager draws may look different.
    if (m_desk->CanDoAll()) {
        EXPECT_TRUE(after->changed.empty());
        EXPECT_EQ(PixelsOf(*after), PixelsOf(*before));
    }
    EXPECT_TRUE(
        Eventually([&] { return stream->TakeNewest(SoonEnough()).outcome == PictureOutcome::Nothing; }));
}

TEST_P(StreamContract, TellsOfSomethingNewOnceUntilAPictureIsTaken) {
    const auto window = AddWindow(FRAME, GREEN);
    NEEDS(window);
    m_desk->Settle();
    Server().SetNoticeReceiver(m_log);
    const auto stream = Open(MainDisplay());
    NEEDS(stream);
    const auto told = CNoticeLog::OfStream(stream->Id());
    EXPECT_TRUE(m_log->WaitFor(told)) << "the first picture is new";
    ASSERT_TRUE(ReadUntil(*stream, INSIDE, GREEN));
    m_desk->Settle();
    ASSERT_TRUE(ReadsAll(*stream));
    NEEDS(m_desk->Recolour(*window, BLUE));
    EXPECT_TRUE(m_log->WaitFor(told));
    NEEDS(m_desk->Recolour(*window, RED));
    NEEDS(m_desk->Recolour(*window, GREEN));
    NEEDS(m_desk->Recolour(*window, RED));
    m_desk->Settle();
    EXPECT_EQ(m_log->Count(told), 1u);
    ASSERT_TRUE(ReadUntil(*stream, INSIDE, RED));
    m_desk->Settle();
    ASSERT_TRUE(ReadsAll(*stream));
    NEEDS(m_desk->Recolour(*window, BLUE));
    EXPECT_TRUE(m_log->WaitFor(told));
}

TEST_P(StreamContract, TellsNothingOfAStreamThatIsClosed) {
    const auto window = AddWindow(FRAME, GREEN);
    NEEDS(window);
    Server().SetNoticeReceiver(m_log);
    auto closed = Open(MainDisplay());
    const auto open = Open(MainDisplay());
    NEEDS(closed && open);
    EXPECT_NE(closed->Id(), open->Id());
    const std::uint64_t id = closed->Id();
    ASSERT_NE(Next(*closed), nullptr);
    ASSERT_NE(Next(*open), nullptr);
    closed.reset();
    m_log->Clear();
    NEEDS(m_desk->Recolour(*window, BLUE));
    EXPECT_TRUE(m_log->WaitFor(CNoticeLog::OfStream(open->Id())));
    EXPECT_EQ(m_log->Count(CNoticeLog::OfStream(id)), 0u);
    const auto next = Open(MainDisplay());
    NEEDS(next);
    EXPECT_NE(next->Id(), id);
}

TEST_P(StreamContract, SaysGoneForADisplayThatIsGone) {
    const auto display = m_desk->AddDisplay({160, 100});
    NEEDS(display);
    ASSERT_TRUE(Eventually([&] { return ListedDisplay(*display).has_value(); }));
    const auto stream = Open(*display);
    NEEDS(stream);
    ASSERT_NE(Next(*stream), nullptr);
    NEEDS(m_desk->Unplug(*display));
    const auto outcome = [&] { return stream->TakeNewest(SoonEnough()).outcome; };
    ASSERT_TRUE(Eventually([&] { return outcome() == PictureOutcome::Gone; }));
    EXPECT_EQ(Server().OpenDisplayStream({.display = *display}).outcome, PictureOutcome::Gone);
    NEEDS(m_desk->PlugInAgain(*display));
    ASSERT_TRUE(Eventually([&] { return ListedDisplay(*display).has_value(); }));
    EXPECT_EQ(outcome(), PictureOutcome::Gone) << "it was removed";
    const auto anew = Open(*display);
    ASSERT_NE(anew, nullptr);
    EXPECT_NE(Next(*anew), nullptr);
}

TEST_P(StreamContract, SaysGoneForADisplayThatNeverWas) {
    NEEDS(Open(MainDisplay()));
    for (const CGDirectDisplayID display : {0U, ~0U})
        EXPECT_EQ(Server().OpenDisplayStream({.display = display}).outcome, PictureOutcome::Gone);
}

TEST_P(StreamContract, SaysTimeoutForADeadlineThatHasPassed) {
    const auto stream = Open(MainDisplay());
    NEEDS(stream);
    EXPECT_EQ(stream->TakeNewest({}).outcome, PictureOutcome::Timeout);
    EXPECT_EQ(stream->TakeNewest(CmSteadyNow()).outcome, PictureOutcome::Timeout);
    EXPECT_NE(Next(*stream), nullptr);
}

TEST_P(StreamContract, SaysGoneWhenItIsKeptBeyondItsServer) {
    const auto stream = Open(MainDisplay());
    NEEDS(stream);
    const PicturePtr picture = Next(*stream);
    ASSERT_NE(picture, nullptr);
    m_desk->Release().reset();
    const DisplayPictureResult after = stream->TakeNewest(SoonEnough());
    EXPECT_EQ(after.outcome, PictureOutcome::Gone);
    EXPECT_EQ(after.picture, nullptr);
    EXPECT_TRUE(IsLawful(*picture));
    EXPECT_FALSE(PixelsOf(*picture).empty());
}

TEST_P(StreamContract, DrawsThePointerInWhereItIsAskedTo) {
    NEEDS(m_desk->ChangeCursor());
    NEEDS(m_desk->MovePointer({40, 40}));
    m_desk->Settle();
    const auto without = Open(MainDisplay());
    const auto with = Open(MainDisplay(), true);
    NEEDS(without && with);
    const PicturePtr plain = Next(*without);
    ASSERT_NE(plain, nullptr);
    EXPECT_TRUE(Eventually([&] {
        const auto picture = with->TakeNewest(SoonEnough()).picture;
        return picture != nullptr && PixelsOf(*picture) != PixelsOf(*plain);
    }));
    NEEDS(m_desk->MovePointer({90, 70}));
    EXPECT_NE(Next(*with), nullptr) << "a pointer that moves is something new";
}
