// SPDX-License-Identifier: Apache-2.0
#include "platform/av_foundation.h"

#include "tests/platform/av_foundation_rig.h"
#include "tests/support/trace_log.h"

#include <cmath>
#include <limits>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>

/// What a session does, is told and tells, operation by operation.

namespace {

using namespace platform;

class AVFoundation : public CSessionRig {};

} // namespace

// ---- Input, output, connection

TEST_F(AVFoundation, AnInputNeedsADisplayThatIsThere) {
    EXPECT_EQ(AVCaptureScreenInput::initWithDisplayID(9), nullptr);
    EXPECT_EQ(AVCaptureScreenInput::initWithDisplayID(0), nullptr);
    EXPECT_EQ(AVCaptureScreenInput::initWithDisplayID(RIG_DISPLAY)->displayID(), RIG_DISPLAY);
    server->Lose();
    EXPECT_EQ(AVCaptureScreenInput::initWithDisplayID(RIG_DISPLAY), nullptr);
}

TEST_F(AVFoundation, AScaleIsHeldBetweenTwoFifthsAndOne) {
    EXPECT_EQ(input->scaleFactor(), 1.0F);
    const auto set = [this](CGFloat factor) {
        input->setScaleFactor(factor);
        return input->scaleFactor();
    };
    EXPECT_EQ(set(0.75F), 0.75F);
    EXPECT_EQ(set(0.4F), 0.4F);
    EXPECT_EQ(set(0.39F), 0.4F);
    EXPECT_EQ(set(-1), 0.4F);
    EXPECT_EQ(set(std::numeric_limits<float>::infinity()), 1.0F);
    EXPECT_EQ(set(std::nanf("")), 1.0F);
}

TEST_F(AVFoundation, WhatIsSetIsThere) {
    input->setMinFrameDuration(CMTimeMake(1, 7));
    input->setRemovesDuplicateFrames(false);
    input->setCapturesCursor(true);
    input->setCropRect({{1, 2}, {3, 4}});
    EXPECT_EQ(input->minFrameDuration(), CMTimeMake(1, 7));
    EXPECT_FALSE(input->removesDuplicateFrames());
    EXPECT_TRUE(input->capturesCursor());
    EXPECT_EQ(input->cropRect(), (CGRect{{1, 2}, {3, 4}}));
    output->setAlwaysDiscardsLateVideoFrames(false);
    EXPECT_FALSE(output->alwaysDiscardsLateVideoFrames());
    const auto connection = output->connections().at(0);
    connection->setVideoMinFrameDuration(CMTimeMake(1, 5));
    connection->setVideoMaxFrameDuration(CMTimeMake(1, 6));
    EXPECT_EQ(connection->videoMinFrameDuration(), CMTimeMake(1, 5));
    EXPECT_EQ(connection->videoMaxFrameDuration(), CMTimeMake(1, 6));
}

TEST_F(AVFoundation, NoVideoSettingsAreTheDefaultsAndUnknownOnesChangeNothing) {
    const std::string key = kCVPixelBufferPixelFormatTypeKey;
    EXPECT_EQ(output->videoSettings().at(key), 32u);
    output->setVideoSettings(AVVideoSettings{{key, 33}});
    output->setVideoSettings(AVVideoSettings{{"Other", 1}});
    EXPECT_EQ(output->videoSettings().at(key), 32u);
    output->setVideoSettings(std::nullopt);
    EXPECT_EQ(output->videoSettings().at(key), static_cast<std::uint32_t>(kCVPixelFormatType_32RGBA));
}

TEST_F(AVFoundation, ThereIsAConnectionWhileThereAreInputAndOutput) {
    ASSERT_EQ(output->connections().size(), 1u);
    session->removeInput(input);
    EXPECT_TRUE(output->connections().empty());
    session->addInput(input);
    EXPECT_EQ(output->connections().size(), 1u);
    session->removeOutput(output);
    EXPECT_TRUE(output->connections().empty());
}

TEST_F(AVFoundation, TakesOneInputAndOneOutput) {
    const auto otherInput = AVCaptureScreenInput::initWithDisplayID(2);
    const auto otherOutput = AVCaptureVideoDataOutput::init();
    EXPECT_FALSE(session->canAddInput(otherInput));
    EXPECT_FALSE(session->canAddOutput(otherOutput));
    session->addInput(otherInput);
    session->addOutput(otherOutput);
    EXPECT_TRUE(otherOutput->connections().empty());
    session->removeInput(otherInput);
    session->removeOutput(otherOutput);
    EXPECT_EQ(output->connections().size(), 1u);
    session->removeInput(input);
    session->removeOutput(output);
    EXPECT_TRUE(session->canAddInput(otherInput));
    EXPECT_TRUE(session->canAddOutput(otherOutput));
    EXPECT_FALSE(session->canAddInput(nullptr));
    EXPECT_FALSE(session->canAddOutput(nullptr));
}

TEST_F(AVFoundation, ASessionThatEndsLeavesInputAndOutputToOthers) {
    session = nullptr;
    EXPECT_TRUE(output->connections().empty());
    EXPECT_EQ(input.use_count(), 1);
    EXPECT_EQ(output.use_count(), 1);
}

// ---- Start and stop

TEST_F(AVFoundation, RunsFromStartToStopAndTells) {
    const auto threads = CountThreadsOfProcess();
    const CSessionEar ear(session);
    EXPECT_FALSE(session->isRunning());
    StartAndTake();
    EXPECT_EQ(ear.Heard(), "S");
    EXPECT_EQ(CountThreadsOfProcess(), threads + 2); // with the one that delivered
    session->startRunning();
    EXPECT_EQ(ear.Heard(), "S");
    session->stopRunning();
    EXPECT_FALSE(session->isRunning());
    EXPECT_EQ(ear.Heard(), "SX");
    EXPECT_EQ(WaitForThreadsOfProcess(threads + 1), threads + 1);
    session->stopRunning();
    EXPECT_EQ(ear.Heard(), "SX");
    StartAndTake();
    EXPECT_EQ(ear.Heard(), "SXS");
}

TEST_F(AVFoundation, GivesNoSampleAfterAStop) {
    StartAndTake();
    session->stopRunning();
    ColourWindow(0x00FF00);
    const unsigned looks = Looks();
    clock->Advance(std::chrono::seconds(1));
    UntilQueueIsEmpty();
    EXPECT_EQ(taker->came.Count(), 1);
    EXPECT_EQ(Looks(), looks);
}

TEST_F(AVFoundation, ASampleThatWaitsForItsQueueIsDroppedByAStop) {
    CGate gate;
    dispatch_async(queue, [&] { EXPECT_TRUE(gate.Passes()); });
    Start();
    UntilLooks(1);
    Tick();
    session->stopRunning();
    gate.Open();
    UntilQueueIsEmpty();
    EXPECT_EQ(taker->came.Count(), 0);
}

TEST_F(AVFoundation, RunsWithoutInputAndGivesSamplesWhenThereIsOne) {
    session->removeInput(input);
    Start();
    EXPECT_EQ(server->CallsOf(SimulatedOperation::OpenDisplayStream), 0u);
    session->addInput(input);
    // Without one it may have looked already, and then looks again after a thirtieth of a second.
    clock->Advance(std::chrono::nanoseconds(std::chrono::seconds(1)) / 30);
    ASSERT_TRUE(taker->came.Reaches(1));
    session->removeInput(input);
    clock->Advance(RIG_PERIOD);
    EXPECT_TRUE(session->isRunning());
}

TEST_F(AVFoundation, AnotherInputShowsAnotherDisplay) {
    StartAndTake();
    session->beginConfiguration();
    session->removeInput(input);
    session->addInput(AVCaptureScreenInput::initWithDisplayID(2));
    session->commitConfiguration();
    TakeNext(2);
    EXPECT_EQ(taker->Last().width, 20u);
}

TEST_F(AVFoundation, AStartWhileItIsBeingConfiguredRaises) {
    session->beginConfiguration();
    session->beginConfiguration();
    session->commitConfiguration();
    EXPECT_THROW(session->startRunning(), NSException);
    EXPECT_FALSE(session->isRunning());
    session->commitConfiguration();
    session->commitConfiguration(); // one too many
    StartAndTake();
}

TEST_F(AVFoundation, AConfigurationComesIntoForceAsAWhole) {
    StartAndTake();
    session->beginConfiguration();
    input->setScaleFactor(0.5F);
    Settle();
    EXPECT_EQ(taker->came.Count(), 1);
    input->setCropRect({{0, 0}, {20, 10}});
    session->commitConfiguration();
    TakeNext(2);
    EXPECT_EQ(taker->Last().width, 10u);
    EXPECT_EQ(taker->Last().height, 5u);
}

// ---- Samples in time

TEST_F(AVFoundation, GivesOneSampleAFrameDurationAndNoneWithoutAChange) {
    StartAndTake();
    Settle();
    EXPECT_EQ(taker->came.Count(), 1);
    ColourWindow(0x00FF00);
    clock->Advance(RIG_PERIOD / 2);
    ColourWindow(0x0000FF);
    clock->Advance(RIG_PERIOD / 2);
    ASSERT_TRUE(taker->came.Reaches(2));
    Settle();
    EXPECT_EQ(taker->came.Count(), 2);
    EXPECT_EQ(taker->Last().At(0, 0), (Colour{0, 0, 255, 255}));
}

TEST_F(AVFoundation, RepeatsUnchangedPicturesWhenTold) {
    input->setRemovesDuplicateFrames(false);
    StartAndTake();
    TakeNext(2);
    TakeNext(3);
    EXPECT_EQ(taker->Last().At(0, 0), RIG_RED);
    input->setRemovesDuplicateFrames(true);
    Settle();
    EXPECT_EQ(taker->came.Count(), 3);
}

TEST_F(AVFoundation, TheLongerFrameDurationHolds) {
    output->connections().at(0)->setVideoMinFrameDuration(CMTimeMakeWithSeconds(0.5, 10000));
    StartAndTake();
    ColourWindow(0x00FF00);
    const unsigned looks = Looks();
    for (int i = 0; i < 4; ++i) {
        UntilItSleeps();
        clock->Advance(RIG_PERIOD);
    }
    UntilItSleeps();
    EXPECT_EQ(Looks(), looks);
    TakeNext(2);
}

TEST_F(AVFoundation, ADurationThatIsNoneLeavesAThirtieth) {
    input->setMinFrameDuration(CMTimeMake(1, 0));
    StartAndTake();
    ColourWindow(0x00FF00);
    UntilItSleeps();
    const unsigned looks = Looks();
    clock->Advance(std::chrono::milliseconds(33));
    UntilItSleeps();
    EXPECT_EQ(Looks(), looks);
    clock->Advance(std::chrono::milliseconds(1));
    EXPECT_TRUE(taker->came.Reaches(2));
}

TEST_F(AVFoundation, ALateSampleGivesWayToTheNewest) {
    CGate gate;
    taker->inside = [&](const CMSampleBufferRef&) {
        if (taker->came.Count() == 0) {
            EXPECT_TRUE(gate.Passes());
        }
    };
    Start();
    UntilLooks(1);
    for (std::uint32_t colour = 1; colour <= 20; ++colour) {
        ColourWindow(colour);
        Tick();
    }
    Tick();
    gate.Open();
    ASSERT_TRUE(taker->came.Reaches(2));
    UntilQueueIsEmpty();
    EXPECT_EQ(taker->came.Count(), 2);
    EXPECT_EQ(taker->Last().At(0, 0), (Colour{0, 0, 20, 255}));
}

TEST_F(AVFoundation, LateSamplesWaitWhenTold) {
    output->setAlwaysDiscardsLateVideoFrames(false);
    CGate gate;
    taker->inside = [&](const CMSampleBufferRef&) { EXPECT_TRUE(gate.Passes()); };
    Start();
    UntilLooks(1);
    for (std::uint32_t colour = 1; colour <= 3; ++colour) {
        ColourWindow(colour);
        Tick();
    }
    Tick();
    gate.Open();
    ASSERT_TRUE(taker->came.Reaches(4));
}

TEST_F(AVFoundation, ADelegateThatIsGoneIsNotCalled) {
    CTally called;
    taker->inside = [&](const CMSampleBufferRef&) { called.Add(); };
    taker = nullptr;
    Start();
    UntilLooks(1);
    Tick();
    UntilQueueIsEmpty();
    EXPECT_EQ(called.Count(), 0);
}

TEST_F(AVFoundation, NoDelegateAndNoQueueTakeNothing) {
    output->setSampleBufferDelegate({}, nullptr);
    Start();
    UntilLooks(1);
    Settle();
    EXPECT_EQ(taker->came.Count(), 0);
    output->setSampleBufferDelegate(taker, queue);
    ColourWindow(0x00FF00);
    TakeNext(1);
}

TEST_F(AVFoundation, ANewDelegateIsCalledOnItsQueue) {
    StartAndTake();
    const auto other = std::make_shared<CSampleTaker>();
    const dispatch_queue_t otherQueue = dispatch_queue_create("other", DISPATCH_QUEUE_SERIAL);
    CGate gate;
    dispatch_async(queue, [&] { EXPECT_TRUE(gate.Passes()); });
    ColourWindow(0x00FF00);
    Tick();
    Tick();
    output->setSampleBufferDelegate(other, otherQueue);
    ColourWindow(0x0000FF);
    Tick();
    EXPECT_TRUE(other->came.Reaches(1)); // although the first queue is held up
    gate.Open();
    UntilQueueIsEmpty();
    EXPECT_EQ(taker->came.Count(), 1); // its second one was late
}

TEST_F(AVFoundation, WhatADelegateThrowsIsTracedAndTheSessionGoesOn) {
    CTraceLog log;
    taker->inside = [&](const CMSampleBufferRef&) { throw std::runtime_error("from a delegate"); };
    Start();
    UntilLooks(1);
    EXPECT_TRUE(log.WaitUntilContains("from a delegate"));
    ColourWindow(0x00FF00);
    Tick();
    EXPECT_TRUE(log.WaitUntilContains("from a delegate", 2));
}
