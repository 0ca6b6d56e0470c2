// SPDX-License-Identifier: Apache-2.0
#include "platform/av_foundation.h"

#include "tests/platform/av_foundation_rig.h"
#include "tests/support/trace_log.h"

#include <memory>
#include <stdexcept>

/// What goes wrong with a session, by itself or as planned, and what it tells of it.

namespace {

using namespace platform;

class AVFoundationFailures : public CSessionRig {};

/// Waits until the session has died.
void ExpectDeath(const AVCaptureSession& session, const CSessionEar& ear) {
    ASSERT_TRUE(ear.Hears(3));
    EXPECT_FALSE(session.isRunning());
    EXPECT_EQ(ear.Heard(), "SEX");
    EXPECT_FALSE(ear.LastError().empty());
}

} // namespace

// ---- What becomes of the desktop

TEST_F(AVFoundationFailures, ADisplayThatIsGoneCannotBeStarted) {
    const CSessionEar ear(session);
    ASSERT_TRUE(server->RemoveDisplay(RIG_DISPLAY));
    session->startRunning();
    EXPECT_FALSE(session->isRunning());
    EXPECT_EQ(ear.Heard(), "E");
    EXPECT_EQ(ear.LastError(), "The display is not there any more.");
}

TEST_F(AVFoundationFailures, ALostServerCannotBeStarted) {
    const CSessionEar ear(session);
    server->Lose();
    session->startRunning();
    EXPECT_FALSE(session->isRunning());
    EXPECT_EQ(ear.Heard(), "E");
    server->FindAgain();
    StartAndTake();
    EXPECT_EQ(ear.Heard(), "ES");
}

TEST_F(AVFoundationFailures, ARemovedDisplayEndsTheRunning) {
    const CSessionEar ear(session);
    const auto threads = CountThreadsOfProcess();
    StartAndTake();
    ASSERT_TRUE(server->RemoveDisplay(RIG_DISPLAY));
    Tick();
    ExpectDeath(*session, ear);
    EXPECT_EQ(WaitForThreadsOfProcess(threads + 1), threads + 1);
    session->stopRunning();
    EXPECT_EQ(ear.Heard(), "SEX");
}

TEST_F(AVFoundationFailures, ALostServerEndsTheRunningAndItCanBeStartedAgain) {
    const CSessionEar ear(session);
    StartAndTake();
    server->Lose();
    Tick();
    ExpectDeath(*session, ear);
    server->FindAgain();
    StartAndTake();
    EXPECT_EQ(ear.Heard(), "SEXS");
}

TEST_F(AVFoundationFailures, APermissionTakenBackEndsTheRunning) {
    const CSessionEar ear(session);
    server->SetCapability(Capability::Streams, Availability::AfterPermission);
    server->SetPermission(Permission::Granted);
    StartAndTake();
    server->SetPermission(Permission::Denied);
    Tick();
    ExpectDeath(*session, ear);
}

TEST_F(AVFoundationFailures, AServerThatStallsOrFailsOnceIsWaitedFor) {
    const CSessionEar ear(session);
    StartAndTake();
    ColourWindow(0x00FF00);
    server->Stall();
    Tick();
    server->Answer();
    TakeNext(2);
    int count = 2;
    for (const PictureOutcome outcome :
         {PictureOutcome::Stale, PictureOutcome::Timeout, PictureOutcome::Failed, PictureOutcome::Nothing}) {
        ColourWindow(0x100 * static_cast<std::uint32_t>(++count));
        server->FailNext(SimulatedOperation::TakeNewest, outcome);
        Tick();
        TakeNext(count);
    }
    EXPECT_EQ(ear.Heard(), "S");
}

TEST_F(AVFoundationFailures, ASampleOnItsWayWhenTheSessionDiesIsDelivered) {
    CGate gate;
    dispatch_async(queue, [&] { EXPECT_TRUE(gate.Passes()); });
    const CSessionEar ear(session);
    bool wasRunning = true;
    taker->inside = [&](const CMSampleBufferRef&) { wasRunning = session->isRunning(); };
    Start();
    UntilLooks(1);
    ASSERT_TRUE(server->RemoveDisplay(RIG_DISPLAY));
    Tick();
    ExpectDeath(*session, ear);
    gate.Open();
    ASSERT_TRUE(taker->came.Reaches(1));
    EXPECT_FALSE(wasRunning);
}

TEST_F(AVFoundationFailures, AnotherWindowServerIsFollowed) {
    StartAndTake();
    const auto other = Scene().Display(0, 0, 24, 16).Background(0x00FF00).Serve();
    ReplaceWindowServer(other);
    clock->Advance(RIG_PERIOD);
    ASSERT_TRUE(taker->came.Reaches(2));
    EXPECT_EQ(taker->Last().width, 24u);
}

TEST_F(AVFoundationFailures, AResolutionThatChangesShowsInTheNextSample) {
    StartAndTake();
    ASSERT_TRUE(server->ResizeDisplay(RIG_DISPLAY, {30, 40}));
    TakeNext(2);
    EXPECT_EQ(taker->Last().width, 30u);
    EXPECT_EQ(taker->Last().height, 40u);
}

// ---- Notifications

TEST_F(AVFoundationFailures, AnObserverHearsItsSessionOnlyAndNothingOnceRemoved) {
    const auto other = AVCaptureSession::init();
    const CSessionEar otherEar(other);
    auto ear = std::make_unique<CSessionEar>(session);
    Start();
    EXPECT_EQ(ear->Heard(), "S");
    ear = nullptr;
    session->stopRunning();
    EXPECT_EQ(otherEar.Heard(), "");
}

TEST_F(AVFoundationFailures, AnObserverNeedsASelectorAndASession) {
    AVCaptureNotificationCenter* const center = AVCaptureNotificationCenter::defaultCenter();
    const auto name = AVCaptureSessionRuntimeErrorNotification;
    EXPECT_FALSE(center->addObserver(this, nullptr, name, session));
    EXPECT_FALSE(center->addObserver(
        this, [](const AVCaptureNotification&) {}, name, nullptr));
    center->removeObserver(this);
}

TEST_F(AVFoundationFailures, AnObserverMayRemoveItselfFromInsideACall) {
    int heard = 0;
    AVCaptureNotificationCenter* const center = AVCaptureNotificationCenter::defaultCenter();
    center->addObserver(
        this,
        [&](const AVCaptureNotification&) {
            ++heard;
            center->removeObserver(this);
        },
        AVCaptureSessionDidStartRunningNotification, session);
    Start();
    session->stopRunning();
    Start();
    EXPECT_EQ(heard, 1);
}

TEST_F(AVFoundationFailures, WhatAnObserverThrowsIsTraced) {
    const CTraceLog log;
    CSessionEar ear(session);
    ear.inside = [](const AVCaptureNotification&) { throw std::runtime_error("from an observer"); };
    Start();
    EXPECT_TRUE(log.Contains("from an observer"));
}

// ---- Planned failures

TEST_F(AVFoundationFailures, NothingIsMadeWhenThatIsPlanned) {
    script->Fail(AVCaptureOperation::SessionInit);
    script->Fail(AVCaptureOperation::ScreenInputInit);
    script->Fail(AVCaptureOperation::VideoDataOutputInit);
    EXPECT_EQ(AVCaptureSession::init(), nullptr);
    EXPECT_EQ(AVCaptureScreenInput::initWithDisplayID(RIG_DISPLAY), nullptr);
    EXPECT_EQ(AVCaptureVideoDataOutput::init(), nullptr);
    EXPECT_NE(AVCaptureSession::init(), nullptr);
    EXPECT_NE(AVCaptureScreenInput::initWithDisplayID(RIG_DISPLAY), nullptr);
    EXPECT_NE(AVCaptureVideoDataOutput::init(), nullptr);
}

TEST_F(AVFoundationFailures, NothingCanBeAddedWhenThatIsPlanned) {
    session->removeInput(input);
    session->removeOutput(output);
    script->Fail(AVCaptureOperation::CanAddInput);
    script->Fail(AVCaptureOperation::CanAddOutput);
    EXPECT_FALSE(session->canAddInput(input));
    EXPECT_FALSE(session->canAddOutput(output));
    EXPECT_TRUE(session->canAddInput(input));
    EXPECT_TRUE(session->canAddOutput(output));
}

TEST_F(AVFoundationFailures, StartAndStopRaiseWhatIsPlanned) {
    script->Do(AVCaptureOperation::StartRunning, [] { throw NSException("Name", "no start"); });
    script->Do(AVCaptureOperation::StopRunning, [] { throw NSException("Name", "no stop"); });
    try {
        session->startRunning();
        FAIL() << "nothing was raised";
    } catch (const NSException& exception) {
        EXPECT_EQ(exception.description(), "no start");
        EXPECT_STREQ(exception.what(), "no start");
        EXPECT_EQ(exception.name(), "Name");
    }
    EXPECT_FALSE(session->isRunning());
    StartAndTake();
    EXPECT_THROW(session->stopRunning(), NSException);
    EXPECT_TRUE(session->isRunning());
    script->Do(AVCaptureOperation::StopRunning, [] { throw std::runtime_error("another kind"); });
    EXPECT_THROW(session->stopRunning(), std::runtime_error);
    session->stopRunning();
    EXPECT_FALSE(session->isRunning());
}

TEST_F(AVFoundationFailures, StartAndStopDoNothingWhenThatIsPlanned) {
    script->Fail(AVCaptureOperation::StartRunning);
    session->startRunning();
    EXPECT_FALSE(session->isRunning());
    StartAndTake();
    script->Fail(AVCaptureOperation::StopRunning);
    session->stopRunning();
    EXPECT_TRUE(session->isRunning());
}

TEST_F(AVFoundationFailures, AConnectionSupportsNoDurationsWhenThatIsPlanned) {
    const auto connection = output->connections().at(0);
    EXPECT_TRUE(connection->isVideoMinFrameDurationSupported());
    EXPECT_TRUE(connection->isVideoMaxFrameDurationSupported());
    script->Fail(AVCaptureOperation::IsVideoMinFrameDurationSupported);
    EXPECT_FALSE(connection->isVideoMinFrameDurationSupported());
    EXPECT_TRUE(connection->isVideoMaxFrameDurationSupported());
    script->Fail(AVCaptureOperation::IsVideoMaxFrameDurationSupported);
    EXPECT_FALSE(connection->isVideoMaxFrameDurationSupported());
}

TEST_F(AVFoundationFailures, SamplesCannotBeReadWhenThatIsPlanned) {
    CMSampleBufferRef sample;
    taker->inside = [&](const CMSampleBufferRef& given) { sample = given; };
    StartAndTake();
    script->Fail(AVCaptureOperation::GetImageBuffer);
    EXPECT_EQ(CMSampleBufferGetImageBuffer(sample.get()), nullptr);
    const CVPixelBufferRef image = CMSampleBufferGetImageBuffer(sample.get());
    ASSERT_NE(image, nullptr);
    script->Fail(AVCaptureOperation::LockBaseAddress);
    EXPECT_EQ(CVPixelBufferLockBaseAddress(image.get(), 1), kCVReturnError);
    EXPECT_EQ(CVPixelBufferUnlockBaseAddress(image.get(), 1), kCVReturnInvalidArgument);
    ASSERT_EQ(CVPixelBufferLockBaseAddress(image.get(), 1), kCVReturnSuccess);
    script->Fail(AVCaptureOperation::GetBaseAddress);
    EXPECT_EQ(CVPixelBufferGetBaseAddress(image.get()), nullptr);
    EXPECT_NE(CVPixelBufferGetBaseAddress(image.get()), nullptr);
    script->Fail(AVCaptureOperation::GetBytesPerRow);
    EXPECT_EQ(CVPixelBufferGetBytesPerRow(image.get()), 39u * 4);
    EXPECT_EQ(CVPixelBufferGetBytesPerRow(image.get()), 40u * 4);
}

TEST(AVCaptureScript, PlansByNumberUntilItIsHealedAndCounts) {
    AVCaptureScript script;
    const auto operation = AVCaptureOperation::CanAddInput;
    script.Fail(operation, 2, 2);
    EXPECT_FALSE(script.Enter(operation));
    EXPECT_TRUE(script.Enter(operation));
    EXPECT_TRUE(script.Enter(operation));
    EXPECT_FALSE(script.Enter(operation));
    script.Fail(operation, 1, AVCaptureScript::ALL);
    EXPECT_TRUE(script.Enter(operation));
    EXPECT_FALSE(script.Enter(AVCaptureOperation::CanAddOutput));
    script.Heal(operation);
    EXPECT_FALSE(script.Enter(operation));
    int done = 0;
    script.Do(
        operation, [&] { ++done; }, 2);
    EXPECT_FALSE(script.Enter(operation));
    EXPECT_EQ(done, 0);
    EXPECT_FALSE(script.Enter(operation));
    EXPECT_EQ(done, 1);
    EXPECT_EQ(script.CallsOf(operation), 8u);
}
