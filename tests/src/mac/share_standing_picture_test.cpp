// SPDX-License-Identifier: Apache-2.0
#include "platform/core_graphics_images.h"
#include "src/mac/cgs_composition.h"
#include "src/mac/share_capturer_context_mac.h"
#include "src/mac/share_capturer_tovel.h"
#include "src/share_util.h"
#include "tests/src/mac/backend_tools.h"
#include "tests/src/mac/painted_desk.h"
#include "tests/support/engine_bench.h"
#include "tests/support/test_effort.h"
#include "tests/support/threads.h"

#include <screenshare/share_capturer.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <functional>
#include <initializer_list>
#include <iostream>
#include <memory>
#include <ostream>
#include <string>
#include <vector>

// What captures leave undone on a desktop at rest, if its window server tells that it is.

using namespace platform;
using namespace painted_desk;

namespace {

using ms = std::chrono::milliseconds;

constexpr CGWindowID WINDOW = 2;

/// A default back-end, and two frames that take turns.
struct CStandingBench {
    CStandingBench() {
        desktop->AddWindow(EditorsWindow());
        desktop->TellMoments(true);
        EXPECT_TRUE(backEnd.init(context));
        context->AddSharedDisplay(MAIN);
        for (ShareRef<CShareFrame>& each : frames) {
            each = ShareRef<CShareFrame>(new CShareFrame);
            each.Get()->AllowNote(); // as an engine's
        }
    }

    static SimulatedWindow EditorsWindow() {
        SimulatedWindow window;
        window.info.id = WINDOW;
        window.info.owner = EDITOR;
        window.info.frame = {{10, 10}, {50, 40}};
        window.content = SimulatedContent::Colour(0x00FF00);
        return window;
    }

    CShareFrame& Frame(std::size_t which = 0) { return *frames[which].Get(); }
    /// With a partner, it may take over what is in the other frame.
    unsigned Capture(std::size_t which = 0, bool hasPartner = false) {
        Frame(which).BeginFilling(hasPartner ? &Frame(1 - which) : nullptr);
        const unsigned result = backEnd.captureToIShareFrame(&Frame(which));
        Frame(which).EndFilling();
        return result;
    }
    unsigned Questions() const {
        return desktop->CallsOf(SimulatedOperation::GetWindows) +
               desktop->CallsOf(SimulatedOperation::GetDisplays) +
               desktop->CallsOf(SimulatedOperation::TakeWindowPicture) +
               desktop->CallsOf(SimulatedOperation::GetPointerPosition);
    }
    /// Whether a capture asks the desktop for anything.
    bool Asks(std::size_t which = 0, bool hasPartner = false) {
        const unsigned before = Questions();
        Capture(which, hasPartner);
        return Questions() != before;
    }
    /// Windows that have moved come to rest.
    void Rest() {
        for (int i = 0; i < 3; ++i) {
            clock->Advance(ms(501));
            Capture();
        }
        EXPECT_EQ(Capture(), 0u);
    }

    CManualClockScope clock;
    CSettingsScope settings;
    CServedScene desktop{Beginning()};
    std::shared_ptr<ShareCapturerContext> context = std::make_shared<ShareCapturerContextMac>();
    ShareCapturerTovel backEnd;
    std::array<ShareRef<CShareFrame>, 2> frames;
};

class StandingPicture : public testing::Test, protected CStandingBench {};

/// Something that a picture goes by.
struct Cause {
    const char* name;
    void (*change)(CStandingBench& bench);
};

std::ostream& operator<<(std::ostream& out, const Cause& cause) {
    return out << cause.name;
}

const Cause CAUSES[] = {
    {"APainting", [](auto& b) { b.desktop->SetContent(WINDOW, SimulatedContent::Colour(0x0000FF)); }},
    {"AWindowThatMoves",
     [](auto& b) {
         b.desktop->MoveWindow(WINDOW, {20, 20});
     }},
    {"AnotherTitle", [](auto& b) { b.desktop->SetTitle(WINDOW, "Letter"); }},
    {"ThePointersPlace",
     [](auto& b) {
         b.desktop->SetPointer(CGPoint{12, 12});
     }},
    {"AnotherCursor", [](auto& b) { b.desktop->SetCursor(SquareCursor(0x123456)); }},
    {"AnotherDisplay",
     [](auto& b) {
         b.desktop->ResizeDisplay(SIDE, {70, 50});
     }},
    {"AnApplicationThatEnds", [](auto& b) { b.desktop->EndApplication(NOTES); }},
    {"ALostServer", [](auto& b) { b.desktop->Lose(); }},
    {"AStalledServer", [](auto& b) { b.desktop->Stall(); }},
    {"WhatMovesByItself",
     [](auto& b) {
         b.desktop->SetContent(WINDOW, SimulatedContent::Moving(ms(100), [](int, int, std::uint64_t frame) {
                                   return Opaque(frame % 2 == 0 ? 0xFF0000 : 0x00FF00);
                               }));
     }},
    {"ACallThatIsToFail", [](auto& b) { b.desktop->FailNext(SimulatedOperation::TakeWindowPicture); }},
    {"AWindowKeptOut", [](auto& b) { b.context->AddUnSharedWindow(WINDOW); }},
    {"AnApplicationKeptOut", [](auto& b) { b.context->AddUnSharedApp(static_cast<unsigned>(EDITOR)); }},
    {"AnotherShareType", [](auto& b) { b.context->SetShareType(SHARE_TYPE_APP); }},
    {"TheAreaOfWindows", [](auto& b) { b.context->m_bNoWindowBaseArea = false; }},
    {"MenuBarsLeftOut", [](auto& b) { b.context->m_bExcludeMenuBar = true; }},
    {"ExposedRegionsWanted", [](auto& b) { b.context->m_bFindsExposed = true; }},
    {"AnotherWalk",
     [](auto& b) {
         b.context->AddUnSharedWindow(WINDOW);
         b.context->UpdateShareCapturerContext();
         b.context->RemoveUnSharedWindow(WINDOW);
     }},
    {"TheDisplayCaptured", [](auto& b) { b.backEnd.setCaptureDisplay(SIDE); }},
    {"TheLimit",
     [](auto& b) {
         b.backEnd.setMaxSize({60, 40});
     }},
    {"TheFlags", [](auto& b) { b.settings->m_nShareConfigFlags = SHARE_CONFIG_FLAG_NO_POINTER; }},
    {"NoWalks", [](auto& b) { b.settings->m_nShareConfigFlags = SHARE_CONFIG_FLAG_NO_WINDOW_WALK; }},
    {"TimesTraced", [](auto& b) { b.settings->m_nShareConfigFlags = SHARE_CONFIG_FLAG_PERFORMANCE_TRACE; }},
    {"TheScale", [](auto& b) { b.settings->SetCurrentScale(0.5F); }},
    {"TheBackground", [](auto& b) { b.settings->m_nAppShareBackgroundColor = 0x102030; }},
    {"TheDisplayRule", [](auto& b) { b.settings->m_bAppDisplayByWindow = false; }},
    {"NoResampling", [](auto& b) { b.settings->m_bCaptureResampleEnable = false; }},
    {"AFixedSize", [](auto& b) { b.settings->m_bCaptureResampleFixSizeEnable = true; }},
    {"AnotherFixedSize", [](auto& b) { b.settings->m_nResampleScreenCaptureWidth = 100; }},
};

class StandingPictureEnds : public StandingPicture, public testing::WithParamInterface<Cause> {};

} // namespace

TEST_F(StandingPicture, IsCapturedAnewWithoutAQuestion) {
    Rest();
    EXPECT_FALSE(Asks());
    clock->Advance(ms(33));
    Frame().SetMetaInfo({});
    EXPECT_EQ(Capture(), 0u);
    EXPECT_EQ(Frame().GetTimestamp(), ShareUtil::GetCaptureFrameTimeStamp());
    EXPECT_EQ(Frame().GetMetaInfo().rectCapture, (TVLRect{0, 0, 120, 80}));
    EXPECT_TRUE(Frame().GetMetaInfo().bPointerCaptured);
    EXPECT_EQ(backEnd.pointerCaptured(), 1);
    EXPECT_EQ(PixelAt(Frame(), 20, 20), Rgb(0x00FF00));
}

TEST_F(StandingPicture, IsDrawnOnceIntoEachFrame) {
    Rest();
    EXPECT_FALSE(Asks(1)) << "the window server's pictures are still there";
    EXPECT_EQ(Frame(1).GetTimestamp(), ShareUtil::GetCaptureFrameTimeStamp());
    EXPECT_EQ(Frame(1).GetMetaInfo().rectCapture, (TVLRect{0, 0, 120, 80}));
    EXPECT_TRUE(Frame(1).GetMetaInfo().bPointerCaptured);
    EXPECT_EQ(Frame(0).NoteNumber(), Frame(1).NoteNumber()) << "both show it";
    Frame(1).Reset(); // without its note it may hold anything
    std::fill_n(Frame(1).GetFrameData(), CShareFrame::BackedDataLen(Frame(1)),
                static_cast<unsigned char>(0xA5));
    EXPECT_FALSE(Asks(1));
    EXPECT_EQ(std::memcmp(Frame(0).GetFrameData(), Frame(1).GetFrameData(),
                          static_cast<std::size_t>(CShareFrame::BackedDataLen(Frame(1)))),
              0);
}

TEST_F(StandingPicture, IsHadFromThePartnerInsteadOfBeingDrawn) {
    Rest();
    EXPECT_FALSE(Asks(1));
    for (const std::uint32_t rgb : {0x112233U, 0x445566U, 0x778899U}) {
        desktop->SetContent(WINDOW, SimulatedContent::Colour(rgb));
        ASSERT_EQ(Capture(0, true), 0u);
        const unsigned char* const drawn = Frame(0).GetFrameData();
        const unsigned char* const former = Frame(1).GetFrameData();
        clock->Advance(ms(33));
        EXPECT_FALSE(Asks(1, true));
        EXPECT_EQ(Frame(1).GetFrameData(), drawn);
        EXPECT_EQ(Frame(1).GetTimestamp(), ShareUtil::GetCaptureFrameTimeStamp());
        EXPECT_EQ(Frame(1).GetMetaInfo().rectCapture, (TVLRect{0, 0, 120, 80}));
        EXPECT_EQ(PixelAt(Frame(1), 20, 20), Rgb(rgb));
        EXPECT_EQ(Frame(0).GetFrameData(), former) << "the partner has this one's";
        EXPECT_NE(PixelAt(Frame(0), 20, 20), Rgb(rgb));
        EXPECT_FALSE(Asks(0, true)) << "and back";
        EXPECT_EQ(Frame(0).GetFrameData(), drawn);
        EXPECT_FALSE(Asks(0, true)) << "it has it itself";
        EXPECT_EQ(Frame(0).GetFrameData(), drawn);
    }
}

TEST_F(StandingPicture, IsHadFromAPartnerOfAnotherSize) {
    Rest();
    Frame(1).SetFrameSize(10, 10);
    EXPECT_FALSE(Asks(1, true));
    EXPECT_EQ(SizeOf(Frame(1)), (TVLSize{120, 80}));
    EXPECT_EQ(SizeOf(Frame(0)), (TVLSize{10, 10}));
    EXPECT_EQ(PixelAt(Frame(1), 20, 20), Rgb(0x00FF00));
}

TEST_F(StandingPicture, IsNotHadFromAPartnerThatShowsAnother) {
    Rest();
    EXPECT_FALSE(Asks(1));
    desktop->SetContent(WINDOW, SimulatedContent::Colour(0x112233));
    const unsigned char* const pixels = Frame(0).GetFrameData();
    EXPECT_TRUE(Asks(0, true));
    EXPECT_EQ(Frame(0).GetFrameData(), pixels) << "drawn";
    EXPECT_EQ(PixelAt(Frame(0), 20, 20), Rgb(0x112233));
}

TEST_F(StandingPicture, IsDrawnWhereAFrameHasMemoryOfTheClient) {
    for (const std::size_t owner : {std::size_t{0}, std::size_t{1}}) {
        CStandingBench bench;
        std::vector<unsigned char> memory(std::size_t{120} * 80 * 4);
        bench.Rest();
        ASSERT_EQ(bench.Frame(owner).SetExternalBuf(memory.data(), static_cast<int>(memory.size())), 0);
        for (const std::size_t which : {std::size_t{0}, std::size_t{1}, std::size_t{0}}) {
            EXPECT_EQ(bench.Capture(which, true), 0u);
            EXPECT_EQ(bench.Frame(owner).GetFrameData(), memory.data());
            EXPECT_EQ(PixelAt(bench.Frame(which), 20, 20), Rgb(0x00FF00));
        }
    }
}

TEST_F(StandingPicture, IsNotKnownWhereTheServerDoesNotTell) {
    desktop->TellMoments(false);
    Rest();
    EXPECT_TRUE(Asks());
}

TEST_F(StandingPicture, IsNotKnownInAFrameThatKeepsNoNote) {
    const FrameRef plain = NewFrameRef();
    for (int i = 0; i < 3; ++i) {
        const unsigned before = Questions();
        EXPECT_EQ(backEnd.captureToIShareFrame(plain.Get()), 0u);
        EXPECT_NE(Questions(), before);
    }
}

TEST_F(StandingPicture, IsMadeEachTimeForTheLinesThatItTraces) {
    Rest();
    const CTraceLog trace; // at the most detailed level
    EXPECT_TRUE(Asks());
    EXPECT_TRUE(trace.Contains("UpdateShareCapturerContext begin"));
}

TEST_F(StandingPicture, IsNotTakenForTheNextOneWhileItIsMade) {
    for (const auto operation : {SimulatedOperation::GetWindows, SimulatedOperation::TakeWindowPicture}) {
        Rest();
        desktop->SetContent(WINDOW, SimulatedContent::Colour(0x112233));
        desktop->DoAt(operation, 1, [this] { context->AddUnSharedWindow(WINDOW); });
        Capture();
        clock->Advance(ms(501));
        EXPECT_TRUE(Asks()) << "it may show what is kept out";
        Rest();
        EXPECT_EQ(CountOf(Frame(), 0x112233), 0);
        context->RemoveUnSharedWindow(WINDOW);
    }
}

TEST_F(StandingPicture, DoesNotStandForAWalkOverFormerWindows) {
    Rest();
    desktop->SetContent(WINDOW, SimulatedContent::Colour(0x112233));
    // Behind the walk and the list of what is captured, ahead of the picture.
    desktop->DoAt(SimulatedOperation::TakeWindowPicture, 1, [this] { desktop->SetTitle(WINDOW, "Letter"); });
    EXPECT_EQ(Capture(), 0u);
    EXPECT_TRUE(Asks());
    EXPECT_FALSE(Asks());
}

TEST_F(StandingPicture, IsOfOneWindowServer) {
    Rest();
    const CServedScene other(Beginning()); // without the editor's window
    other->TellMoments(true);
    clock->Advance(ms(501));
    Capture();
    clock->Advance(ms(501));
    EXPECT_EQ(Capture(), 0u);
    EXPECT_EQ(CountOf(Frame(), 0x00FF00), 0);
}

TEST_F(StandingPicture, IsFollowedByOneOfTheSameWindowsWithoutAListOfThem) {
    Rest();
    desktop->SetContent(WINDOW, SimulatedContent::Colour(0x112233));
    desktop->SetPointer(CGPoint{70, 60});
    const unsigned lists = desktop->CallsOf(SimulatedOperation::GetWindows);
    const unsigned pictures = desktop->CallsOf(SimulatedOperation::TakeWindowPicture);
    EXPECT_EQ(Capture(), 0u);
    EXPECT_EQ(desktop->CallsOf(SimulatedOperation::TakeWindowPicture), pictures + 1);
    EXPECT_EQ(desktop->CallsOf(SimulatedOperation::GetWindows), lists + 2) << "before and behind the picture";
    EXPECT_EQ(PixelAt(Frame(), 20, 20), Rgb(0x112233));
    EXPECT_EQ(PixelAt(Frame(), 71, 61), Rgb(0xFFFFFF)) << "the pointer";
    EXPECT_FALSE(Asks());
}

TEST_F(StandingPicture, IsFollowedByAWholeCaptureWhenAnotherWindowHasCome) {
    Rest();
    SimulatedWindow window = EditorsWindow();
    window.info.id = WINDOW + 1;
    window.content = SimulatedContent::Colour(0x445566);
    desktop->AddWindow(window);
    clock->Advance(ms(501));
    Capture();
    clock->Advance(ms(501));
    EXPECT_EQ(Capture(), 0u);
    EXPECT_EQ(PixelAt(Frame(), 20, 20), Rgb(0x445566));
}

TEST_F(StandingPicture, IsDrawnAgainIntoAFrameThatHasLostIt) {
    Rest();
    const std::array<unsigned char, 4> pixel{1, 2, 3, 4};
    for (const auto& spoil : std::initializer_list<std::function<void()>>{
             [&] { Frame().WriteFrameData(pixel.data(), static_cast<int>(pixel.size())); },
             [&] { Frame().SetFrameDataFormat(SHARE_FRAME_FORMAT_ARGB); },
             [&] { Frame().SetFrameSize(10, 10); },
         }) {
        EXPECT_EQ(Capture(1), 0u);
        spoil();
        EXPECT_FALSE(Asks());
        EXPECT_EQ(SizeOf(Frame()), SizeOf(Frame(1)));
        EXPECT_EQ(Frame().GetFrameDataFormat(), SHARE_FRAME_FORMAT_RGBA);
        EXPECT_EQ(std::memcmp(Frame(0).GetFrameData(), Frame(1).GetFrameData(),
                              static_cast<std::size_t>(CShareFrame::BackedDataLen(Frame(1)))),
                  0);
    }
}

TEST_F(StandingPicture, IsHadAgainOnlyAtItsMoment) {
    Rest();
    const CGWindowID windows[] = {WINDOW};
    const CGWindowImageRef image = CGWindowListTakeImage({{0, 0}, {120, 80}}, windows, 0, false);
    ASSERT_NE(image, nullptr);
    CGWindowImageMemo memo;
    memo.Keep(image.get());
    EXPECT_EQ(CGWindowImageGetMoment(memo.Recall().get()), CGWindowImageGetMoment(image.get()));
    desktop->SetTitle(WINDOW, "Letter");
    EXPECT_EQ(memo.Recall(), nullptr) << "of a former moment";
}

TEST_P(StandingPictureEnds, WithEachChangeOfWhatItGoesBy) {
    Rest();
    ASSERT_FALSE(Asks());
    GetParam().change(*this);
    const unsigned before = Questions();
    const bool wasAnswered = Capture() == 0 && Questions() == before;
    EXPECT_FALSE(wasAnswered);
}

INSTANTIATE_TEST_SUITE_P(Causes, StandingPictureEnds, testing::ValuesIn(CAUSES),
                         [](const auto& each) { return std::string(each.param.name); });

// ---- Beside pictures drawn from scratch

namespace {

/// The back-end on a desktop on which anything may happen, and mostly nothing does.
class StandingPictureOracle : public StandingPicture {
protected:
    void Step() {
        if (m_dice.OneIn(3))
            m_desk.Change();
        if (m_dice.OneIn(15))
            ChangeShare();
        if (m_dice.OneIn(40))
            desktop->TellMoments(m_dice.OneIn(4));
        else
            desktop->TellMoments(true);
        clock->Advance(ms(m_dice.OneIn(3) ? 501 : 33));
        const auto which = static_cast<std::size_t>(m_dice.Between(0, 1));
        const unsigned before = Questions();
        const unsigned char* const others = Frame(1 - which).GetFrameData();
        if (Capture(which, m_dice.OneIn(2)) != 0)
            return;
        ++pictures;
        if (Frame(which).GetFrameData() == others)
            ++had;
        if (Questions() == before)
            ++standing;
        Judge(Frame(which));
    }

    int pictures = 0;
    int standing = 0;
    int had = 0; // from the partner

private:
    void ChangeShare() {
        const auto window = static_cast<unsigned>(m_desk.AnyWindow());
        switch (m_dice.Between(0, 6)) {
            case 0:
                context->AddUnSharedWindow(window);
                return;
            case 1:
            case 2:
                context->RemoveUnSharedWindow(window);
                return;
            case 3:
                backEnd.setMaxSize({m_dice.Between(40, 130), m_dice.Between(40, 90)});
                return;
            case 4:
                backEnd.setMaxSize({1920, 1080});
                return;
            case 5:
                settings->m_nAppShareBackgroundColor = m_dice.Between(0, 0xFFFFFF);
                return;
            default:
                context->SetShareType(m_dice.OneIn(2) ? SHARE_TYPE_DESKTOP : SHARE_TYPE_APP);
        }
    }
    void Judge(CShareFrame& frame) {
        CShareCGSCapturer composition(context);
        composition.setMaxSize(SizeOf(frame));
        const FrameRef scratch = NewFrameRef();
        ASSERT_EQ(composition.capture(scratch.Get(), MAIN, SizeOf(frame), SizeOf(frame)), 0);
        const int bytes = CShareFrame::BackedDataLen(frame);
        ASSERT_EQ(bytes, CShareFrame::BackedDataLen(*scratch.Get()));
        EXPECT_EQ(
            std::memcmp(frame.GetFrameData(), scratch.Get()->GetFrameData(), static_cast<std::size_t>(bytes)),
            0)
            << "picture " << pictures;
        EXPECT_EQ(frame.GetMetaInfo().rectCapture, scratch.Get()->GetMetaInfo().rectCapture);
        EXPECT_EQ(frame.GetMetaInfo().bPointerCaptured, scratch.Get()->GetMetaInfo().bPointerCaptured);
    }

    CPaintedDesk m_desk{*desktop.operator->(), 4711};
    CDice& m_dice = m_desk.dice;
};

} // namespace

TEST_F(StandingPictureOracle, ShowsWhatIsDrawnFromScratch) {
    const int steps = TestRounds(3000);
    for (const pid_t pid : {EDITOR, NOTES})
        context->AddSharedApp(static_cast<unsigned>(pid));
    context->SetShareType(SHARE_TYPE_DESKTOP);
    for (int i = 0; i < steps && !HasFailure(); ++i)
        Step();
    std::cout << steps << " steps, seed 4711: " << pictures << " pictures, " << standing << " of them stood, "
              << had << " were the partner's\n";
    EXPECT_GT(pictures, steps / 3);
    EXPECT_GT(standing, steps / 10);
    EXPECT_GT(had, steps / 30);
}
