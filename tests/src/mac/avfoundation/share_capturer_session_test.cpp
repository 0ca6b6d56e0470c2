// SPDX-License-Identifier: Apache-2.0
#include "src/mac/avfoundation/share_capturer_session.h"

#include "src/share_util.h"
#include "tests/src/mac/avfoundation/session_bench.h"

#include <stdexcept>

// What the back-ends of sessions have in common: how they live, what they answer, what a pass gives.

using namespace platform;

// ---- Its life

TEST_P(SessionBackEnd, IsReadyOnTheMainDisplayAfterInit) {
    EXPECT_EQ(backEnd->getCaptureDisplay(), MAIN);
    EXPECT_EQ(backEnd->getCaptureRect(), Rect(0, 0, 200, 120));
    EXPECT_TRUE(context->m_bFindsExposed);
    EXPECT_FALSE(context->IsAppUnShared(ShareUtil::GetCurrentPID()))
        << "whom the client lists is its own affair";
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{200, 120}));
    EXPECT_EQ(frame.Get()->GetFrameDataFormat(), SHARE_FRAME_FORMAT_ARGB);
}

TEST_P(SessionBackEnd, MakesAContextWhenItIsGivenNone) {
    const CTraceLog trace;
    const auto other = Make();
    EXPECT_TRUE(other->init());
    EXPECT_EQ(trace.LinesContaining("::init]"), Lines{OfBackEnd("::init] without context")});
    AwaitSamples();
    EXPECT_EQ(other->captureToIShareFrame(frame.Get()), OK);
    EXPECT_EQ(Meta().rectCapture, (TVLRect{0, 0, 0, 0})) << "nobody has shared a display yet";
}

TEST_P(SessionBackEnd, AnswersBeforeItIsReady) {
    const auto unfit = Make();
    EXPECT_EQ(unfit->captureToIShareFrame(frame.Get()), FAILED);
    EXPECT_EQ(unfit->captureToIShareFrame(nullptr), FAILED);
    EXPECT_EQ(unfit->getCaptureDisplay(), 0u);
    EXPECT_EQ(unfit->getCaptureRect(), CGRect{});
    EXPECT_EQ(unfit->setFPS(30), 0);
    EXPECT_TRUE(unfit->setCaptureDisplay(SIDE));
    EXPECT_EQ(unfit->getCaptureDisplay(), SIDE);
    unfit->setMaxSize({100, 60});
    EXPECT_EQ(unfit->onScreenResolutionChanged(SIDE), 0);
    EXPECT_EQ(unfit->onDisplayPlugin(SIDE), 1);
}

TEST_P(SessionBackEnd, AnswersWhatEveryBackEndAnswers) {
    context->AddSharedApp(static_cast<unsigned>(EDITOR));
    EXPECT_EQ(backEnd->capture(), nullptr);
    EXPECT_EQ(backEnd->getCaptureFormat(), 4) << "though its frames have another";
    EXPECT_EQ(backEnd->setCaptureThreadCount(3), Code(-5));
    EXPECT_EQ(backEnd->getSharedAppCount(), 0u);
    EXPECT_EQ(backEnd->getFrameSize(), (TVLSize{0, 0}));
    EXPECT_FALSE(backEnd->IsWindowAreaBaseContentSupport());
}

TEST_P(SessionBackEnd, LeavesNothingBehind) {
    context->m_bFindsExposed = true;
    const CTraceLog trace;
    EXPECT_EQ(Show(), OK);
    backEnd = nullptr;
    EXPECT_TRUE(trace.WaitUntilContains("[ShareAVFCapturer dealloc]"));
    EXPECT_FALSE(context->m_bFindsExposed);
    EXPECT_EQ(context.use_count(), 1);
    const unsigned looks = desktop->CallsOf(DesktopOperation::TakeNewest);
    Advance(ms(1000));
    EXPECT_EQ(desktop->CallsOf(DesktopOperation::TakeNewest), looks);
}

TEST_P(SessionBackEnd, LeavesNothingBehindOfASessionThatDied) {
    const CTraceLog trace;
    LoseAndFindTheDesktop();
    ASSERT_TRUE(trace.WaitUntilContains("didStopRunning"));
    backEnd = nullptr;
    EXPECT_TRUE(trace.Contains("[ShareAVFCapturer stopRun] CatpureSession is already stopped"));
    EXPECT_TRUE(trace.WaitUntilContains("[ShareAVFCapturer dealloc]")) << "its queue keeps it no longer";
}

TEST_P(SessionBackEnd, EndsAlsoWhenItsSessionCannotBeStopped) {
    const CTraceLog trace;
    script->Do(Operation::StopRunning, [] { throw std::runtime_error("stuck"); });
    backEnd = nullptr;
    EXPECT_TRUE(trace.Contains("[ShareCapturerSession::EndSession]>>fail>>stuck"));
    Tick(); // then the session sees that nobody wants its samples
    EXPECT_TRUE(trace.WaitUntilContains("[ShareAVFCapturer dealloc]"));
}

// ---- Without a session

TEST_P(SessionBackEnd, GivesNothingWithoutAFailureWhenItsSessionDoesNotStart) {
    script->Fail(Operation::StartRunning, 1, AVCaptureScript::ALL);
    const auto other = Make();
    EXPECT_TRUE(other->init(context));
    for (int i = 0; i < 5; ++i) {
        Tick();
        EXPECT_EQ(other->captureToIShareFrame(frame.Get()), NO_DATA);
    }
    EXPECT_EQ(other->setFPS(20), 20) << "the rate that it would have";
}

TEST_P(SessionBackEnd, GivesNothingWithoutAFailureWhenThereIsNoSession) {
    script->Fail(Operation::SessionInit);
    const auto other = Make();
    EXPECT_TRUE(other->init(context));
    EXPECT_EQ(other->captureToIShareFrame(frame.Get()), NO_DATA);
    EXPECT_EQ(other->onScreenResolutionChanged(MAIN), 0);
    EXPECT_EQ(other->getCaptureRect(), Rect(0, 0, 200, 120)) << "of the display all the same";
}

TEST_P(SessionBackEnd, GivesNothingOnceItsSessionHasDied) {
    LoseAndFindTheDesktop();
    for (int i = 0; i < 3; ++i)
        EXPECT_EQ(Show(), NO_DATA);
    EXPECT_EQ(backEnd->onScreenResolutionChanged(MAIN), 1);
    EXPECT_EQ(PassSoon(), OK) << "a change of displays has it begin again";
}

TEST_P(SessionBackEnd, IsUnfitWhenItsSessionRaisesWhatNobodyReckonsWith) {
    script->Do(Operation::StartRunning, [] { throw std::runtime_error("no session"); });
    const CTraceLog trace;
    EXPECT_FALSE(Make()->init(context));
    EXPECT_TRUE(trace.Contains("[" + std::string(kind.name) + "::init]>>fail>>no session"));
}

TEST_P(SessionBackEnd, LetsNothingOutOfAPass) {
    context->NoteInterruption();
    script->Do(Operation::StopRunning, [] { throw std::runtime_error("stuck"); });
    const CTraceLog trace;
    EXPECT_EQ(Pass(), FAILED);
    EXPECT_TRUE(trace.Contains("[" + std::string(kind.name) + "::captureToIShareFrame]>>fail>>stuck"));
}

// ---- Rate and size

TEST_P(SessionBackEnd, HandsItsRateToTheSession) {
    EXPECT_EQ(backEnd->setFPS(-1), 10) << "which changes nothing";
    EXPECT_EQ(backEnd->setFPS(2), 2);
    Tick();
    Advance(ms(500));
    while (Pass() == OK) {
    }
    int shown = 0;
    for (int i = 0; i < 20; ++i)
        shown += Show() == OK ? 1 : 0;
    EXPECT_EQ(shown, 4) << "in two seconds";
    EXPECT_EQ(Count(RED), SECRET_PIXELS);
}

TEST_P(SessionBackEnd, TracesALimitOnceAndHandsItToTheSession) {
    const CTraceLog trace;
    backEnd->setMaxSize({0, 0});
    EXPECT_EQ(trace.Lines(), Lines{}) << "it had none";
    backEnd->setMaxSize({100, 60});
    backEnd->setMaxSize({100, 60});
    EXPECT_EQ(trace.LinesContaining("Size"),
              Lines{OfBackEnd("::setMaxSize],m_szMaxCapture:x=0,y=0,nMaxSize:x=100,y=60")});
    EXPECT_EQ(trace.LinesContaining("setScale to"), Lines{Info("[ShareAVFCapturer setScale to ]100 * 60")});
    Tick();
    EXPECT_EQ(Pass(), OK);
    EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{100, 60}));
    EXPECT_EQ(Meta().rectCapture, (TVLRect{0, 0, 200, 120}));
    backEnd->setMaxSize({400, 240});
    EXPECT_EQ(trace.LinesContaining("::setMaxSize]").back(),
              OfBackEnd("::setMaxSize],m_szMaxCapture:x=100,y=60,nMaxSize:x=400,y=240"));
}

TEST_P(SessionBackEnd, NeverScalesBelowTwoFifths) {
    backEnd->setMaxSize({20, 12});
    Tick();
    EXPECT_EQ(Pass(), OK);
    EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{80, 48}));
}

// ---- Displays

TEST_P(SessionBackEnd, TellsItsOwnDisplayFromOthers) {
    const CTraceLog trace;
    EXPECT_EQ(backEnd->onDisplayPlugin(SIDE), 0);
    EXPECT_EQ(backEnd->onDisplayPlugout(SIDE), 0);
    EXPECT_EQ(trace.Lines(), Lines{});
    EXPECT_EQ(backEnd->onDisplayPlugin(MAIN), 1);
    EXPECT_EQ(backEnd->onDisplayPlugout(MAIN), 1);
    EXPECT_EQ(trace.Lines(), (Lines{OfBackEnd("::onDisplayPlugin] captured display is plugin"),
                                    OfBackEnd("::onDisplayPlugout] captured display is plugout")}));
}

TEST_P(SessionBackEnd, BeginsAnewWhicheverDisplayHasChanged) {
    for (const unsigned display : {MAIN, SIDE, 77u}) {
        const unsigned before = Starts();
        EXPECT_EQ(backEnd->onScreenResolutionChanged(display), 1) << display;
        EXPECT_EQ(Starts(), before + 1);
        EXPECT_EQ(backEnd->getCaptureDisplay(), MAIN);
    }
}

TEST_P(SessionBackEnd, SaysThatItDidNotBeginAnewWhenItCannot) {
    script->Do(Operation::StartRunning, [] { throw NSException("name", "reason"); });
    EXPECT_EQ(backEnd->onScreenResolutionChanged(MAIN), 0);
    EXPECT_EQ(backEnd->onScreenResolutionChanged(MAIN), 1);
    script->Do(Operation::StopRunning, [] { throw std::runtime_error("stuck"); });
    EXPECT_EQ(backEnd->onScreenResolutionChanged(MAIN), 0) << "and nothing gets out";
    desktop->RemoveDisplay(MAIN);
    EXPECT_EQ(backEnd->onScreenResolutionChanged(MAIN), 0) << "it has no area now";
}

TEST_P(SessionBackEnd, FollowsTheResolutionOfItsDisplay) {
    desktop->ResizeDisplay(MAIN, {160, 100});
    context->UpdateSharedDisplay(MAIN);
    EXPECT_EQ(backEnd->onScreenResolutionChanged(MAIN), 1);
    UntilRest();
    EXPECT_EQ(Show(), OK);
    while (Pass() == OK) {
    }
    EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{160, 100}));
    EXPECT_EQ(Meta().rectCapture, (TVLRect{0, 0, 160, 100}));
}

TEST_P(SessionBackEnd, ShowsTheDisplayThatItIsGiven) {
    EXPECT_TRUE(backEnd->setCaptureDisplay(SIDE));
    context->ClearSharedDisplay();
    context->AddSharedDisplay(SIDE);
    UntilRest();
    EXPECT_EQ(Pass(), OK);
    EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{200, 100}));
    EXPECT_EQ(Count(TEAL), 200 * 100);
    EXPECT_EQ(Meta().rectCapture, (TVLRect{200, 10, 300, 60}));
    EXPECT_EQ(backEnd->getCaptureRect(), Rect(200, 10, 100, 50));
}

// ---- A pass

TEST_P(SessionBackEnd, GivesNothingWhileNothingChanges) {
    EXPECT_EQ(Pass(), NO_DATA);
    Tick();
    EXPECT_EQ(Pass(), NO_DATA);
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(Pass(), NO_DATA) << "one sample, one picture";
}

TEST_P(SessionBackEnd, StampsWhatItGives) {
    EXPECT_EQ(Show(), OK);
    EXPECT_EQ(frame.Get()->GetTimestamp(), ShareUtil::GetCaptureFrameTimeStamp());
    EXPECT_EQ(Meta().rectCapture, (TVLRect{0, 0, 200, 120}));
    EXPECT_EQ(frame.Get()->GetFrameLineBytes(), 200 * 4);
}

TEST_P(SessionBackEnd, TakesASampleWithoutAFrameAndFails) {
    EXPECT_EQ(backEnd->captureToIShareFrame(nullptr), NO_DATA);
    Paint(TEXT, WHITE);
    Tick();
    EXPECT_EQ(backEnd->captureToIShareFrame(nullptr), FAILED);
    EXPECT_EQ(Pass(), NO_DATA) << "it is gone";
}

TEST_P(SessionBackEnd, HoldsThePictureBackWhileWindowsMove) {
    EXPECT_EQ(Show(), OK);
    desktop->MoveWindow(WALLPAPER, {10, 0});
    Tick();
    EXPECT_EQ(Pass(), DRAGGING);
    const unsigned walks = desktop->CallsOf(DesktopOperation::GetWindows);
    Advance(ms(500));
    EXPECT_EQ(Pass(), DRAGGING);
    EXPECT_EQ(desktop->CallsOf(DesktopOperation::GetWindows), walks) << "and doesn't look at them meanwhile";
    EXPECT_EQ(At(5, 5), Rgb(BLUE)) << "the frame is as it was";
    Advance(ms(1));
    EXPECT_EQ(Pass(), OK);
    EXPECT_EQ(At(5, 5), Rgb(BLACK));
    EXPECT_GT(desktop->CallsOf(DesktopOperation::GetWindows), walks);
}

TEST_P(SessionBackEnd, HoldsThePictureBackAlsoWithoutAFrame) {
    desktop->MoveWindow(WALLPAPER, {10, 0});
    EXPECT_EQ(backEnd->captureToIShareFrame(nullptr), DRAGGING);
}

TEST_P(SessionBackEnd, FailsOnASampleThatCannotBeOpened) {
    for (const Operation operation : {Operation::GetImageBuffer, Operation::LockBaseAddress,
                                      Operation::GetBaseAddress, Operation::GetBytesPerRow}) {
        EXPECT_EQ(Show(), OK);
        script->Fail(operation);
        EXPECT_EQ(Show(), FAILED) << static_cast<int>(operation);
        EXPECT_EQ(Count(green ^ 1), TEXT_PIXELS - TEXT_UNDER_SECRET) << "the frame is as it was";
        EXPECT_EQ(Pass(), NO_DATA);
    }
}

INSTANTIATE_TEST_SUITE_P(BackEnds, SessionBackEnd, testing::Values(FLAT_BACK_END, MIX_BACK_END),
                         [](const auto& each) { return std::string(each.param.name); });
