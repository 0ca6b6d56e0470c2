// SPDX-License-Identifier: Apache-2.0
#include "platform/simulated/simulated_window_server.h"

#include "platform/simulated/scene.h"
#include "tests/platform/conformance_checks.h"
#include "tests/platform/notice_log.h"
#include "tests/support/threads.h"
#include "util/cm_clock.h"

#include <gtest/gtest.h>

#include <chrono>
#include <limits>
#include <memory>
#include <utility>
#include <vector>

/// The script's side, where it goes beyond what every window server promises.

namespace {

using namespace platform;
using namespace std::chrono_literals;

constexpr std::uint32_t GREEN = 0x00FF00;
constexpr std::uint32_t BLUE = 0x0000FF;

class SimulatedWindowServers : public testing::Test {
protected:
    SimulatedWindowServers() { m_server->SetNoticeReceiver(m_log); }

    std::shared_ptr<const WindowPicture> Take(std::vector<CGWindowID> windows, unsigned options) {
        WindowPictureRequest request;
        request.windows = std::move(windows);
        request.rect = {{-1000, -1000}, {3000, 3000}};
        request.options = options;
        request.deadline = CmSteadyNow() + 1s;
        return m_server->TakeWindowPicture(request).picture;
    }

    PictureLayer Layer(CGWindowID window, unsigned options = WindowPictureBoundsIgnoreFraming) {
        const auto picture = Take({window}, options);
        return picture != nullptr && picture->layers.size() == 1 ? picture->layers[0] : PictureLayer();
    }

    std::unique_ptr<DisplayStream> Open(CGDirectDisplayID display, unsigned framesPerSecond = 10) {
        return m_server
            ->OpenDisplayStream(
                {.display = display, .framesPerSecond = framesPerSecond, .withPointer = false})
            .stream;
    }

    static DisplayPictureResult Take(DisplayStream& stream) { return stream.TakeNewest(CmSteadyNow() + 1s); }

    std::uint64_t Generation() const { return m_server->GetWindows()->Generation(); }

    CManualClockScope m_clock;
    const std::shared_ptr<CNoticeLog> m_log = std::make_shared<CNoticeLog>();
    const std::shared_ptr<SimulatedWindowServer> m_server = Scene()
                                                                .Display(0, 0, 200, 120)
                                                                .Display(200, 0, 100, 80)
                                                                .App(100, "Editor")
                                                                .Window(1)
                                                                .At(10, 10, 40, 30)
                                                                .Colour(GREEN)
                                                                .Window(2)
                                                                .At(20, 20, 40, 30)
                                                                .Colour(BLUE)
                                                                .Pointer(50, 60)
                                                                .Serve();
};

} // namespace

// ---- Displays

TEST_F(SimulatedWindowServers, MoveEverythingWhenAnotherDisplayBecomesTheOrigin) {
    ASSERT_TRUE(m_server->SetMainDisplay(2));
    EXPECT_EQ(m_server->GetDisplays()->at(0).id, 2u);
    EXPECT_EQ(m_server->GetDisplays()->at(1).bounds.origin, (CGPoint{-200, 0}));
    EXPECT_EQ(m_server->GetWindows()->Find(1)->frame.origin, (CGPoint{-190, 10}));
    CGPoint pointer;
    EXPECT_TRUE(m_server->GetPointerPosition(pointer));
    EXPECT_EQ(pointer, (CGPoint{-150, 60}));
    EXPECT_EQ(m_log->Count(CNoticeLog::OfDisplay(2, DisplayMoved | DisplaySetMain)), 1u);
    EXPECT_EQ(m_log->Count(CNoticeLog::OfDisplay(1, DisplayMoved | DisplayDesktopShapeChanged)), 1u);
    EXPECT_EQ(m_log->Count(CNoticeLog::OfDisplay(1, DisplaySetMain)), 0u);
}

TEST_F(SimulatedWindowServers, MakeTheNextDisplayTheMainOneWhenItIsRemoved) {
    ASSERT_TRUE(m_server->RemoveDisplay(1));
    ASSERT_EQ(m_server->GetDisplays()->size(), 1u);
    EXPECT_EQ(m_server->GetDisplays()->at(0).bounds.origin, CGPoint());
    const std::vector<Notice> notices = m_log->Notices();
    ASSERT_EQ(notices.size(), 2u);
    EXPECT_EQ(notices[0].display, 1u);
    EXPECT_EQ(notices[0].flags, DisplayRemoved | DisplayDisabled);
    EXPECT_EQ(notices[1].display, 2u);
    EXPECT_EQ(notices[1].flags, DisplayMoved | DisplaySetMain | DisplayDesktopShapeChanged);
}

TEST_F(SimulatedWindowServers, MoveTheOthersWhenTheMainDisplayIsMoved) {
    ASSERT_TRUE(m_server->MoveDisplay(1, {100, 50}));
    EXPECT_EQ(m_server->GetDisplays()->at(0).bounds.origin, CGPoint());
    EXPECT_EQ(m_server->GetDisplays()->at(1).bounds.origin, (CGPoint{100, -50}));
    EXPECT_EQ(m_log->Count(NoticeKind::DisplayChanged), 1u);
}

TEST_F(SimulatedWindowServers, ListAMirroredDisplayOnce) {
    const auto stream = Open(2);
    ASSERT_TRUE(m_server->MirrorDisplay(2, 1));
    EXPECT_EQ(m_server->GetDisplays()->size(), 1u);
    EXPECT_EQ(m_log->Count(CNoticeLog::OfDisplay(2, DisplayRemoved)), 1u);
    EXPECT_EQ(Take(*stream).outcome, PictureOutcome::Gone);
    EXPECT_FALSE(m_server->MirrorDisplay(1, 2)) << "that one shows nothing of its own";
    ASSERT_TRUE(m_server->MirrorDisplay(2, 0));
    EXPECT_EQ(m_log->Count(CNoticeLog::OfDisplay(2, DisplayAdded)), 1u);
    EXPECT_EQ(m_server->GetDisplays()->at(1).bounds, (CGRect{{200, 0}, {100, 80}}));
}

TEST_F(SimulatedWindowServers, TellOfAnotherScaleButNotOfReservedEdges) {
    ASSERT_TRUE(m_server->ReserveEdges(1, {0, 10, 0, 20}));
    EXPECT_EQ(m_server->GetDisplays()->at(0).visibleBounds, (CGRect{{0, 10}, {200, 90}}));
    EXPECT_TRUE(m_log->Notices().empty());
    ASSERT_TRUE(m_server->ScaleDisplay(1, 2));
    EXPECT_EQ(m_log->Notices().at(0).flags, static_cast<unsigned>(DisplaySetMode));
}

TEST_F(SimulatedWindowServers, MendWhatNoDesktopHas) {
    SimulatedDisplay display;
    display.id = ~0U;
    display.scale = -1;
    display.name.clear();
    display.bounds = {{300, 0}, {50, 50}};
    EXPECT_EQ(m_server->AddDisplay(display), 3u);
    EXPECT_TRUE(IsLawful(*m_server->GetDisplays()));
    for (const float alpha : {-1.0F, 2.0F, std::numeric_limits<float>::quiet_NaN()}) {
        ASSERT_TRUE(m_server->SetAlpha(1, alpha));
        EXPECT_TRUE(IsLawful(*m_server->GetWindows()));
    }
}

// ---- Windows

TEST_F(SimulatedWindowServers, LeaveTheGenerationWhereNothingIsDifferent) {
    const std::uint64_t before = Generation();
    EXPECT_TRUE(m_server->MoveWindow(1, {10, 10}));
    EXPECT_TRUE(m_server->RaiseWindow(2));
    EXPECT_TRUE(m_server->SetTitle(1, "Other"));
    EXPECT_TRUE(m_server->SetContent(1, SimulatedContent::Colour(BLUE)));
    m_server->SetPointer(CGPoint{1, 1});
    EXPECT_EQ(Generation(), before);
    EXPECT_EQ(m_server->GetWindows()->Find(1)->title, "Other");
}

TEST_F(SimulatedWindowServers, AnswerFalseForWhatIsNotThere) {
    const std::uint64_t before = Generation();
    EXPECT_FALSE(m_server->MoveWindow(9, {}));
    EXPECT_FALSE(m_server->CloseWindow(9));
    EXPECT_FALSE(m_server->RaiseWindow(9));
    EXPECT_FALSE(m_server->LowerWindow(9));
    EXPECT_FALSE(m_server->SetLevel(9, 1));
    EXPECT_FALSE(m_server->PutWindowAbove(1, 9));
    EXPECT_FALSE(m_server->PutWindowAbove(9, 1));
    EXPECT_FALSE(m_server->PutWindowAbove(1, 1));
    EXPECT_FALSE(m_server->RemoveDisplay(9));
    EXPECT_FALSE(m_server->SetMainDisplay(9));
    EXPECT_FALSE(m_server->MirrorDisplay(1, 9));
    EXPECT_FALSE(m_server->EndApplication(9));
    EXPECT_FALSE(m_server->StartApplication({100, "Twin", "", ApplicationKind::Ordinary, false}));
    SimulatedDisplay twin;
    twin.id = 1;
    EXPECT_EQ(m_server->AddDisplay(twin), 0u);
    EXPECT_EQ(Generation(), before);
    EXPECT_TRUE(m_log->Notices().empty());
}

TEST_F(SimulatedWindowServers, RefuseAWindowIdThatWasUsed) {
    ASSERT_TRUE(m_server->CloseWindow(2));
    SimulatedWindow window;
    window.info.id = 2;
    EXPECT_EQ(m_server->AddWindow(window), 0u);
    window.info.id = 0;
    EXPECT_EQ(m_server->AddWindow(window), 3u);
}

TEST_F(SimulatedWindowServers, StackWindowsWithinTheirLevelsUnlessToldOtherwise) {
    const auto order = [&] {
        std::vector<CGWindowID> ids;
        const auto windows = m_server->GetWindows();
        for (const WindowInfo& window : windows->Windows())
            ids.push_back(window.id);
        return ids;
    };
    using Ids = std::vector<CGWindowID>;
    EXPECT_EQ(order(), (Ids{2, 1}));
    ASSERT_TRUE(m_server->SetLevel(1, 20));
    EXPECT_EQ(order(), (Ids{1, 2}));
    ASSERT_TRUE(m_server->RaiseWindow(2));
    EXPECT_EQ(order(), (Ids{1, 2}));
    ASSERT_TRUE(m_server->PutWindowAbove(2, 1));
    EXPECT_EQ(order(), (Ids{2, 1}));
    ASSERT_TRUE(m_server->LowerWindow(2));
    EXPECT_EQ(order(), (Ids{1, 2}));
}

TEST_F(SimulatedWindowServers, MakeSeveralChangesInOneMoment) {
    const std::uint64_t before = Generation();
    m_server->Change([](SimulatedDesktop& desktop) {
        for (SimulatedWindow& window : desktop.windows)
            window.info.frame.origin.x += 5;
        desktop.windows.emplace_back();
    });
    EXPECT_EQ(Generation(), before + 1);
    EXPECT_NE(m_server->GetWindows()->Find(3), nullptr) << "a window without an id is given one";
}

TEST_F(SimulatedWindowServers, ShowAnotherDesktop) {
    m_server->Show(Scene().Display(0, 0, 100, 100).DisplayId(2).Window(7).Build());
    EXPECT_EQ(m_server->GetDisplays()->size(), 1u);
    EXPECT_EQ(m_log->Count(CNoticeLog::OfDisplay(1, DisplayRemoved)), 1u);
    EXPECT_EQ(m_log->Count(CNoticeLog::OfApplication(NoticeKind::ApplicationEnded, 100)), 1u);
    EXPECT_NE(m_server->GetWindows()->Find(7), nullptr);
    EXPECT_EQ(m_server->GetWindows()->Find(1), nullptr);
}

// ---- Pictures

TEST_F(SimulatedWindowServers, ShowWhatIsAroundAFrameOnlyWhenAskedTo) {
    ASSERT_TRUE(m_server->SetShadow(1, {1, 2, 3, 4}));
    const PictureLayer plain = Layer(1);
    EXPECT_EQ(plain.frame, (CGRect{{10, 10}, {40, 30}}));
    ASSERT_NE(plain.picture, nullptr);
    EXPECT_TRUE(Shows(*plain.picture, GREEN));
    const PictureLayer framed = Layer(1, WindowPictureDefault);
    EXPECT_EQ(framed.frame, (CGRect{{9, 8}, {44, 36}}));
    ASSERT_NE(framed.picture, nullptr);
    EXPECT_EQ(framed.picture->width, 44);
    EXPECT_EQ(framed.picture->height, 36);
    EXPECT_EQ(ArgbAt(*framed.picture, 0, 0), 0x40000000U);
    EXPECT_EQ(ArgbAt(*framed.picture, 1, 2), 0xFF000000U | GREEN);
    EXPECT_EQ(ArgbAt(*framed.picture, 40, 31), 0xFF000000U | GREEN);
    EXPECT_EQ(ArgbAt(*framed.picture, 41, 31), 0x40000000U);
}

TEST_F(SimulatedWindowServers, PaintInEachFormat) {
    const auto content = SimulatedContent::Painted([](int x, int y) {
        return Opaque(static_cast<std::uint32_t>(x * 3) << 16 | static_cast<std::uint32_t>(y * 5) << 8 |
                      static_cast<std::uint32_t>(x + y));
    });
    for (const PixelFormat format : {PixelFormat::BGRX, PixelFormat::BGRA, PixelFormat::RGBX,
                                     PixelFormat::RGBA, PixelFormat::X2R10G10B10}) {
        m_server->Change([&](SimulatedDesktop& desktop) {
            SimulatedWindow* const window = FindWindow(desktop, 1);
            window->content = content;
            window->format = format;
            window->rowGap = 12;
        });
        const PictureLayer layer = Layer(1);
        ASSERT_NE(layer.picture, nullptr);
        EXPECT_EQ(layer.picture->format, format);
        EXPECT_EQ(layer.picture->stride, 40u * 4 + 12);
        const auto shown = layer.picture->format == PixelFormat::X2R10G10B10 ? "ten bits" : "eight bits";
        EXPECT_EQ(ArgbAt(*layer.picture, 39, 29), content.At(39, 29, 0)) << shown;
        EXPECT_EQ(ArgbAt(*layer.picture, 0, 7), content.At(0, 7, 0)) << shown;
    }
}

TEST_F(SimulatedWindowServers, PremultiplyAndLeaveUnpaintedPartsTransparent) {
    ASSERT_TRUE(m_server->SetContent(1, SimulatedContent::Pixels(2, 1, {0x80FF8000U, 0x00FFFFFFU})));
    const PictureLayer layer = Layer(1);
    ASSERT_NE(layer.picture, nullptr);
    EXPECT_EQ(ArgbAt(*layer.picture, 0, 0), 0x80804000U);
    EXPECT_EQ(ArgbAt(*layer.picture, 1, 0), 0u);
    EXPECT_EQ(ArgbAt(*layer.picture, 2, 0), 0u);
    EXPECT_EQ(ArgbAt(*layer.picture, 0, 1), 0u);
    ASSERT_TRUE(m_server->SetContent(1, SimulatedContent()));
    const auto nothing = Take({1}, WindowPictureBoundsIgnoreFraming);
    ASSERT_NE(nothing, nullptr);
    EXPECT_TRUE(nothing->layers.empty());
}

TEST_F(SimulatedWindowServers, PaintInTheScaleOfTheDisplayThatShowsMostOfAWindow) {
    ASSERT_TRUE(m_server->ScaleDisplay(2, 2));
    EXPECT_EQ(Layer(1).picture->width, 40);
    ASSERT_TRUE(m_server->MoveWindow(1, {170, 10}));
    EXPECT_EQ(Layer(1).picture->width, 40) << "three quarters are on the left one";
    ASSERT_TRUE(m_server->MoveWindow(1, {190, 10}));
    EXPECT_EQ(Layer(1).picture->width, 80);
    EXPECT_EQ(Layer(1).picture->scale, 2.0F);
    EXPECT_EQ(Layer(1).frame.size, (CGSize{40, 30}));
}

TEST_F(SimulatedWindowServers, LeaveOutWhatLiesBesideWhatIsLookedAt) {
    WindowPictureRequest request;
    request.windows = {1, 2};
    request.rect = {{55, 45}, {10, 10}};
    request.deadline = CmSteadyNow() + 1s;
    const auto picture = m_server->TakeWindowPicture(request).picture;
    ASSERT_NE(picture, nullptr);
    ASSERT_EQ(picture->layers.size(), 1u);
    EXPECT_EQ(picture->layers[0].window, 2u);
}

TEST_F(SimulatedWindowServers, KeepThePictureWhenTheSamePixelsArePaintedAgain) {
    const PicturePtr before = Layer(1).picture;
    ASSERT_TRUE(m_server->SetContent(1, SimulatedContent::Colour(GREEN)));
    EXPECT_EQ(Layer(1).picture, before);
}

// ---- Streams

TEST_F(SimulatedWindowServers, ComposeADisplayFromItsWindows) {
    ASSERT_TRUE(m_server->SetBackground(1, SimulatedContent::Colour(0x102030)));
    ASSERT_TRUE(m_server->SetAlpha(2, 0.5F));
    const auto stream = Open(1);
    const PicturePtr picture = Take(*stream).picture;
    ASSERT_NE(picture, nullptr);
    EXPECT_EQ(ArgbAtPoint(*picture, {1, 1}), 0xFF102030U);
    EXPECT_EQ(ArgbAtPoint(*picture, {12, 12}), 0xFF00FF00U);
    EXPECT_EQ(ArgbAtPoint(*picture, {30, 30}), 0xFF007F80U) << "half blue over green";
    EXPECT_EQ(ArgbAtPoint(*picture, {59, 49}), 0xFF081098U) << "half blue over the background";
}

TEST_F(SimulatedWindowServers, GivePicturesNoFasterThanAskedFor) {
    const auto stream = Open(1, 10);
    ASSERT_EQ(Take(*stream).outcome, PictureOutcome::Ok);
    for (const std::uint32_t colour : {1U, 2U, 3U}) {
        ASSERT_TRUE(m_server->SetContent(1, SimulatedContent::Colour(colour)));
        EXPECT_EQ(Take(*stream).outcome, PictureOutcome::Nothing);
        m_clock->Advance(99ms);
        EXPECT_EQ(Take(*stream).outcome, PictureOutcome::Nothing);
        m_clock->Advance(1ms);
        EXPECT_EQ(Take(*stream).outcome, PictureOutcome::Ok);
    }
}

TEST_F(SimulatedWindowServers, TellAReaderThatCameTooEarlyWhenItsTimeHasCome) {
    const auto stream = Open(1, 10);
    ASSERT_EQ(Take(*stream).outcome, PictureOutcome::Ok);
    m_log->Clear();
    ASSERT_TRUE(m_server->SetContent(1, SimulatedContent::Colour(1)));
    EXPECT_EQ(m_log->Count(CNoticeLog::OfStream(stream->Id())), 0u);
    m_clock->Advance(100ms);
    EXPECT_TRUE(m_log->WaitFor(CNoticeLog::OfStream(stream->Id())));
    EXPECT_EQ(Take(*stream).outcome, PictureOutcome::Ok);
}

TEST_F(SimulatedWindowServers, TellReadersWhatMovesWithTheClock) {
    ASSERT_TRUE(m_server->SetContent(1, SimulatedContent::Moving(50ms, [](int, int, std::uint64_t frame) {
                                         return Opaque(static_cast<std::uint32_t>(frame));
                                     })));
    const auto stream = Open(1, 1000);
    for (std::uint32_t frame = 1; frame < 10; ++frame) {
        ASSERT_EQ(Take(*stream).outcome, PictureOutcome::Ok);
        EXPECT_EQ(Take(*stream).outcome, PictureOutcome::Nothing);
        m_log->Clear();
        m_clock->Advance(50ms);
        ASSERT_TRUE(m_log->WaitFor(CNoticeLog::OfStream(stream->Id())));
    }
    EXPECT_EQ(ArgbAtPoint(*Take(*stream).picture, {12, 12}), 0xFF000009U);
}

TEST_F(SimulatedWindowServers, TellNobodyOfWhatCannotBeSeen) {
    const auto stream = Open(1);
    ASSERT_EQ(Take(*stream).outcome, PictureOutcome::Ok);
    m_clock->Advance(1s);
    m_log->Clear();
    ASSERT_TRUE(m_server->SetOnScreen(1, true));
    m_server->SetPointer(CGPoint{3, 3});
    ASSERT_TRUE(m_server->MoveWindow(2, {10, 10}));
    ASSERT_TRUE(m_log->WaitFor(CNoticeLog::OfStream(stream->Id())));
    ASSERT_EQ(Take(*stream).outcome, PictureOutcome::Ok);
    m_clock->Advance(1s);
    m_log->Clear();
    ASSERT_TRUE(m_server->SetContent(1, SimulatedContent::Colour(1)));
    EXPECT_EQ(Take(*stream).outcome, PictureOutcome::Nothing) << "it is covered";
    EXPECT_EQ(m_log->Count(CNoticeLog::OfStream(stream->Id())), 0u);
}

TEST_F(SimulatedWindowServers, SayWhichStackALaggingPictureMayStillShow) {
    m_server->SetPictureLag(500ms);
    const auto stream = Open(1, 1000);
    m_clock->Advance(1s);
    const std::uint64_t before = Generation();
    ASSERT_TRUE(m_server->MoveWindow(1, {11, 10}));
    m_clock->Advance(499ms);
    const PicturePtr lagging = Take(*stream).picture;
    ASSERT_NE(lagging, nullptr);
    EXPECT_EQ(lagging->generationBefore, before);
    EXPECT_EQ(lagging->generationAfter, before + 1);
    EXPECT_EQ(Take(*stream).outcome, PictureOutcome::Nothing);
    m_clock->Advance(1ms);
    const PicturePtr settled = Take(*stream).picture;
    ASSERT_NE(settled, nullptr);
    EXPECT_EQ(settled->generationBefore, before + 1);
    EXPECT_TRUE(settled->changed.empty());
}

TEST_F(SimulatedWindowServers, TellWhoAsksOfAStackThatCannotBeSeen) {
    const auto stream = Open(1, 10);
    const PicturePtr first = Take(*stream).picture;
    ASSERT_NE(first, nullptr);
    m_log->Clear();
    ASSERT_TRUE(m_server->SetOwner(1, 0));
    EXPECT_EQ(Take(*stream).outcome, PictureOutcome::Nothing) << "too early";
    m_clock->Advance(100ms);
    EXPECT_EQ(m_log->Count(CNoticeLog::OfStream(stream->Id())), 0u);
    const PicturePtr next = Take(*stream).picture;
    ASSERT_NE(next, nullptr);
    EXPECT_TRUE(next->changed.empty());
    EXPECT_EQ(PixelsOf(*next), PixelsOf(*first));
    EXPECT_EQ(next->generationBefore, Generation());
    EXPECT_EQ(next->generationAfter, Generation());
    m_clock->Advance(100ms);
    EXPECT_EQ(Take(*stream).outcome, PictureOutcome::Nothing);
}

TEST_F(SimulatedWindowServers, HaveOnlyThePointerModesThatTheyAreGiven) {
    m_server->SetPointerModes(true, false);
    EXPECT_EQ(m_server->OpenDisplayStream({.display = 1, .withPointer = true}).outcome,
              PictureOutcome::Unsupported);
    EXPECT_EQ(m_server->OpenDisplayStream({.display = 1, .withPointer = false}).outcome, PictureOutcome::Ok);
    m_server->SetPointerModes(false, true);
    EXPECT_EQ(m_server->OpenDisplayStream({.display = 1, .withPointer = true}).outcome, PictureOutcome::Ok);
    EXPECT_EQ(m_server->OpenDisplayStream({.display = 1, .withPointer = false}).outcome,
              PictureOutcome::Unsupported);
}

// ---- Capabilities and life

TEST_F(SimulatedWindowServers, HaveNothingToGiveWhereACapabilityIsMissing) {
    m_server->SetCursor(ArrowCursor());
    for (const Capability each : {Capability::WindowImages, Capability::Streams, Capability::Pointer,
                                  Capability::Cursor, Capability::Applications, Capability::Activation})
        m_server->SetCapability(each, Availability::No);
    CGPoint position;
    EXPECT_FALSE(m_server->GetPointerPosition(position));
    EXPECT_EQ(m_server->GetCursor(), nullptr);
    EXPECT_TRUE(m_server->GetApplications()->empty());
    EXPECT_FALSE(m_server->BringToFront(100));
    EXPECT_EQ(m_server->OpenDisplayStream({.display = 1}).outcome, PictureOutcome::Unsupported);
    EXPECT_EQ(Take({1}, 0), nullptr);
    EXPECT_EQ(m_log->Count(NoticeKind::ApplicationEnded), 0u) << "they only can't be seen any more";
}

TEST_F(SimulatedWindowServers, TellAfterAStallWhatHasHappenedMeanwhile) {
    m_server->Stall();
    const auto before = m_server->GetWindows();
    ASSERT_TRUE(m_server->MoveWindow(1, {0, 0}));
    ASSERT_TRUE(m_server->RemoveDisplay(2));
    ASSERT_TRUE(m_server->EndApplication(100));
    EXPECT_EQ(m_server->GetWindows(), before);
    EXPECT_EQ(m_server->GetDisplays()->size(), 2u);
    EXPECT_EQ(m_log->Notices().size(), 1u);
    m_server->Answer();
    EXPECT_EQ(m_server->GetDisplays()->size(), 1u);
    EXPECT_TRUE(m_server->GetWindows()->Windows().empty());
    EXPECT_EQ(m_log->Count(NoticeKind::LifeChanged), 2u);
    EXPECT_EQ(m_log->Count(CNoticeLog::OfDisplay(2, DisplayRemoved)), 1u);
    EXPECT_EQ(m_log->Count(NoticeKind::ApplicationEnded), 1u);
}

TEST_F(SimulatedWindowServers, ChangeTheirLifeOnlyFromTheLifeThatTheyHave) {
    m_server->Answer();
    m_server->FindAgain();
    EXPECT_EQ(m_server->GetLife(), (LifeState{Life::Alive, 1}));
    m_server->Lose();
    m_server->Stall();
    m_server->Answer();
    EXPECT_EQ(m_server->GetLife(), (LifeState{Life::Lost, 1}));
    m_server->FindAgain();
    EXPECT_EQ(m_server->GetLife(), (LifeState{Life::Alive, 2}));
    EXPECT_EQ(m_log->Count(NoticeKind::LifeChanged), 2u);
}

TEST_F(SimulatedWindowServers, HaveNoThreadUntilSomethingIsToBeToldLater) {
    const std::ptrdiff_t before = CountThreadsOfProcess();
    m_server->GetWindows();
    ASSERT_TRUE(m_server->MoveWindow(1, {1, 1}));
    Layer(1);
    EXPECT_EQ(CountThreadsOfProcess(), before);
    auto stream = Open(1);
    EXPECT_EQ(CountThreadsOfProcess(), before + 1);
    m_server->Rest();
    EXPECT_TRUE(ThreadsComeDownTo(before));
    Take(*stream);
    EXPECT_EQ(CountThreadsOfProcess(), before + 1) << "the next operation starts it anew";
}

TEST_F(SimulatedWindowServers, GoOnWithoutAThreadWhereNoneCanBeStarted) {
    const CNoNewThreadsScope noThreads;
    const auto stream = Open(1);
    ASSERT_NE(stream, nullptr);
    EXPECT_EQ(Take(*stream).outcome, PictureOutcome::Ok);
    m_clock->Advance(1s);
    m_log->Clear();
    ASSERT_TRUE(m_server->SetContent(1, SimulatedContent::Colour(1)));
    EXPECT_EQ(m_log->Count(CNoticeLog::OfStream(stream->Id())), 1u);
}
