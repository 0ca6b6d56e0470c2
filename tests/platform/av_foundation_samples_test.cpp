// SPDX-License-Identifier: Apache-2.0
#include "tests/platform/av_foundation_rig.h"

#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <limits>
#include <memory>
#include <mutex>
#include <optional>
#include <tuple>
#include <vector>

/// The pixels of a session's samples.

namespace {

using namespace platform;

class AVFoundationSamples : public CSessionRig {
protected:
    using CSessionRig::CSessionRig;

    /// A white square of 4 x 4 points whose hot spot is its top left.
    void ShowCursor(float x, float y) {
        SimulatedCursor cursor;
        cursor.representations.push_back({4, 4, 1.0F, SimulatedContent::Colour(0xFFFFFF)});
        server->SetCursor(cursor);
        server->SetPointer(CGPoint{x, y});
    }
};

constexpr Colour WHITE{255, 255, 255, 255};

/// Scaling may lose a little.
bool IsNear(const Colour& one, const Colour& other) {
    const auto isNear = [](int a, int b) { return std::abs(a - b) <= 2; };
    return isNear(one.red, other.red) && isNear(one.green, other.green) && isNear(one.blue, other.blue) &&
           one.alpha == other.alpha;
}

} // namespace

TEST_F(AVFoundationSamples, ShowTheDisplayInBytesAlphaRedGreenBlue) {
    StartAndTake();
    const SampleCopy sample = taker->Last();
    ASSERT_EQ(sample.width, 40u);
    ASSERT_EQ(sample.height, 30u);
    EXPECT_EQ(sample.format, 32u);
    const std::vector<std::uint8_t> first(sample.bytes.begin(), sample.bytes.begin() + 4);
    EXPECT_EQ(first, (std::vector<std::uint8_t>{255, 255, 0, 0}));
    EXPECT_EQ(sample.At(9, 9), RIG_RED);
    EXPECT_EQ(sample.At(10, 9), RIG_GREY);
    EXPECT_EQ(sample.At(9, 10), RIG_GREY);
    EXPECT_EQ(sample.At(39, 29), RIG_GREY);
}

TEST_F(AVFoundationSamples, FollowTheVideoSettings) {
    output->setVideoSettings(std::nullopt);
    StartAndTake();
    const SampleCopy sample = taker->Last();
    EXPECT_EQ(sample.format, static_cast<std::uint32_t>(kCVPixelFormatType_32RGBA));
    const std::vector<std::uint8_t> first(sample.bytes.begin(), sample.bytes.begin() + 4);
    EXPECT_EQ(first, (std::vector<std::uint8_t>{255, 0, 0, 255}));
}

TEST_F(AVFoundationSamples, HaveEveryPixelOfEveryFormatOfADisplay) {
    for (const PixelFormat format : {PixelFormat::BGRX, PixelFormat::BGRA, PixelFormat::RGBX,
                                     PixelFormat::RGBA, PixelFormat::X2R10G10B10}) {
        server->Change([format](SimulatedDesktop& desktop) {
            desktop.displays[0].format = format;
            desktop.displays[0].rowGap = 12;
        });
        const int before = taker->came.Count();
        Start();
        ASSERT_TRUE(taker->came.Reaches(before + 1));
        const SampleCopy sample = taker->Last();
        ASSERT_EQ(sample.bytes.size(), 40u * 30u * 4u);
        for (std::size_t y = 0; y < 30; ++y) {
            for (std::size_t x = 0; x < 40; ++x)
                ASSERT_EQ(sample.At(x, y), x < 10 && y < 10 ? RIG_RED : RIG_GREY) << x << "," << y;
        }
        session->stopRunning();
    }
}

TEST_F(AVFoundationSamples, AreScaledToTheNearestPixel) {
    for (const auto& [factor, width, height] :
         {std::tuple{0.5F, 20u, 15u}, std::tuple{0.4F, 16u, 12u}, std::tuple{0.71F, 28u, 21u}}) {
        input->setScaleFactor(factor);
        const int before = taker->came.Count();
        Start();
        ASSERT_TRUE(taker->came.Reaches(before + 1));
        const SampleCopy sample = taker->Last();
        EXPECT_EQ(sample.width, width);
        EXPECT_EQ(sample.height, height);
        const auto edge = static_cast<std::size_t>(10 * factor);
        EXPECT_TRUE(IsNear(sample.At(0, 0), RIG_RED));
        EXPECT_TRUE(IsNear(sample.At(edge - 2, edge - 2), RIG_RED));
        EXPECT_TRUE(IsNear(sample.At(edge + 2, 0), RIG_GREY));
        EXPECT_TRUE(IsNear(sample.At(0, edge + 2), RIG_GREY));
        EXPECT_TRUE(IsNear(sample.At(width - 1, height - 1), RIG_GREY));
        session->stopRunning();
    }
}

TEST_F(AVFoundationSamples, FollowAScaleThatChangesWhileTheDisplayStandsStill) {
    StartAndTake();
    input->setScaleFactor(0.5F);
    TakeNext(2);
    EXPECT_EQ(taker->Last().width, 20u);
    Settle();
    EXPECT_EQ(taker->came.Count(), 2);
}

TEST_F(AVFoundationSamples, ShowTheCropRectangleAlone) {
    input->setCropRect({{8, 6}, {10, 8}});
    StartAndTake();
    const SampleCopy sample = taker->Last();
    ASSERT_EQ(sample.width, 10u);
    ASSERT_EQ(sample.height, 8u);
    for (std::size_t y = 0; y < 8; ++y) {
        for (std::size_t x = 0; x < 10; ++x)
            ASSERT_EQ(sample.At(x, y), x < 2 && y < 4 ? RIG_RED : RIG_GREY) << x << "," << y;
    }
}

TEST_F(AVFoundationSamples, ACropRectangleEndsAtTheDisplaysEdges) {
    input->setCropRect({{-5, 25}, {10, 100}});
    StartAndTake();
    EXPECT_EQ(taker->Last().width, 5u);
    EXPECT_EQ(taker->Last().height, 5u);
}

TEST_F(AVFoundationSamples, NoneShowsACropRectangleBesideTheDisplay) {
    input->setCropRect({{41, 0}, {10, 10}});
    Start();
    UntilLooks(1);
    Settle();
    EXPECT_EQ(taker->came.Count(), 0);
    input->setCropRect({});
    TakeNext(1);
    EXPECT_EQ(taker->Last().width, 40u);
}

TEST_F(AVFoundationSamples, AChangeOutsideTheCropRectangleGivesNone) {
    input->setCropRect({{20, 20}, {10, 10}});
    StartAndTake();
    ColourWindow(0x00FF00);
    Settle();
    EXPECT_EQ(taker->came.Count(), 1);
    ASSERT_TRUE(server->MoveWindow(RIG_WINDOW, {15, 15}));
    TakeNext(2);
    EXPECT_EQ(taker->Last().At(0, 0), RIG_GREEN);
}

TEST_F(AVFoundationSamples, CropAndPointerCountInPointsOfAFineDisplay) {
    ASSERT_TRUE(server->ScaleDisplay(RIG_DISPLAY, 2.0F));
    server->SetPointerModes(true, false);
    ShowCursor(12, 10);
    input->setCapturesCursor(true);
    input->setCropRect({{8, 6}, {10, 8}});
    StartAndTake();
    const SampleCopy sample = taker->Last();
    ASSERT_EQ(sample.width, 20u);
    ASSERT_EQ(sample.height, 16u);
    EXPECT_EQ(sample.At(3, 7), RIG_RED);
    EXPECT_EQ(sample.At(4, 7), RIG_GREY);
    EXPECT_EQ(sample.At(7, 8), RIG_GREY);
    EXPECT_EQ(sample.At(8, 8), WHITE);
    EXPECT_EQ(sample.At(15, 15), WHITE);
    EXPECT_EQ(sample.At(16, 8), RIG_GREY);
}

TEST_F(AVFoundationSamples, ShowThePointerOnlyWhenAsked) {
    ShowCursor(20, 10);
    StartAndTake();
    EXPECT_EQ(taker->Last().At(21, 11), RIG_GREY);
    input->setCapturesCursor(true);
    TakeNext(2);
    EXPECT_EQ(taker->Last().At(21, 11), WHITE);
    EXPECT_EQ(taker->Last().At(19, 11), RIG_GREY);
    EXPECT_EQ(taker->Last().At(24, 11), RIG_GREY);
}

TEST_F(AVFoundationSamples, HaveThePointerDrawnInWhenTheServerCannot) {
    server->SetPointerModes(true, false);
    ShowCursor(20, 10);
    input->setCapturesCursor(true);
    StartAndTake();
    for (std::size_t y = 0; y < 30; ++y) {
        for (std::size_t x = 15; x < 40; ++x)
            ASSERT_EQ(taker->Last().At(x, y) == WHITE, x >= 20 && x < 24 && y >= 10 && y < 14)
                << x << "," << y;
    }
}

TEST_F(AVFoundationSamples, APointerThatIsDrawnInMovesOnADisplayThatStandsStill) {
    server->SetPointerModes(true, false);
    ShowCursor(20, 10);
    input->setCapturesCursor(true);
    StartAndTake();
    Settle();
    EXPECT_EQ(taker->came.Count(), 1);
    server->SetPointer(CGPoint{30, 20});
    TakeNext(2);
    EXPECT_EQ(taker->Last().At(21, 11), RIG_GREY);
    EXPECT_EQ(taker->Last().At(31, 21), WHITE);
    server->SetPointer(CGPoint{50, 5}); // on the other display
    TakeNext(3);
    EXPECT_EQ(taker->Last().At(31, 21), RIG_GREY);
    server->SetPointer(CGPoint{52, 5});
    Settle();
    EXPECT_EQ(taker->came.Count(), 3);
}

TEST_F(AVFoundationSamples, AServerThatAlwaysShowsThePointerGivesNoneWithoutIt) {
    server->SetPointerModes(false, true);
    session->startRunning();
    EXPECT_FALSE(session->isRunning());
    input->setCapturesCursor(true);
    StartAndTake();
}

TEST_F(AVFoundationSamples, CarryTheGenerationsOfTheirPicture) {
    StartAndTake();
    const std::uint64_t first = server->GetWindows()->Generation();
    EXPECT_EQ(taker->Last().generations, (CMSampleBufferGenerations{first, first}));
    Settle();
    server->SetPictureLag(std::chrono::milliseconds(150));
    ASSERT_TRUE(server->MoveWindow(RIG_WINDOW, {20, 10}));
    TakeNext(2);
    const std::uint64_t second = server->GetWindows()->Generation();
    ASSERT_GT(second, first);
    EXPECT_EQ(taker->Last().generations, (CMSampleBufferGenerations{first, second}));
}

TEST_F(AVFoundationSamples, KeepTheirPixelsAsLongAsTheyAreHeld) {
    CMSampleBufferRef held;
    taker->inside = [&](const CMSampleBufferRef& sample) {
        if (held == nullptr)
            held = sample;
    };
    StartAndTake();
    for (int i = 0; i < 20; ++i) {
        ColourWindow(i % 2 == 0 ? 0x00FF00 : 0x0000FF);
        TakeNext(i + 2);
    }
    EXPECT_EQ(CopySample(held).At(0, 0), RIG_RED);
}

TEST_F(AVFoundationSamples, NoneIsMadeWhileAllBuffersAreHeldAndTheNewestComesBehind) {
    std::mutex mutex;
    std::vector<CMSampleBufferRef> held;
    taker->inside = [&](const CMSampleBufferRef& sample) {
        const std::lock_guard<std::mutex> lock(mutex);
        held.push_back(sample);
    };
    StartAndTake();
    int taken = 1;
    for (std::uint32_t colour = 1; colour < 7; ++colour) {
        ColourWindow(colour);
        TakeNext(++taken);
    }
    ColourWindow(0x00FF00);
    const unsigned looks = Looks();
    for (int i = 0; i < 3; ++i) {
        UntilItSleeps();
        clock->Advance(RIG_PERIOD);
    }
    UntilItSleeps();
    UntilQueueIsEmpty();
    EXPECT_EQ(taker->came.Count(), 7);
    EXPECT_EQ(Looks(), looks); // the display isn't fetched for nothing
    {
        const std::lock_guard<std::mutex> lock(mutex);
        held.clear();
    }
    TakeNext(8);
    EXPECT_EQ(taker->Last().At(0, 0), RIG_GREEN);
}

TEST(SampleBuffer, CarriesWhatItWasMadeWith) {
    const std::shared_ptr<std::uint8_t> pixels(new std::uint8_t[8](), std::default_delete<std::uint8_t[]>());
    const CVPixelBufferRef image = CVPixelBufferCreateWithBytes(1, 1, 32, 8, pixels);
    const CGRect rect{{-40, 20}, {1280, 720}};
    const CMSampleBufferRef sample = CMSampleBufferCreate(image, {3, 4}, rect);
    EXPECT_EQ(CMSampleBufferGetImageBuffer(sample.get()), image);
    EXPECT_EQ(CMSampleBufferGetGenerations(sample.get()), (CMSampleBufferGenerations{3, 4}));
    EXPECT_EQ(CMSampleBufferGetDisplayRect(sample.get()), rect);
    EXPECT_EQ(CMSampleBufferGetDisplayRect(CMSampleBufferCreate(image, {3, 4}).get()), CGRect());
}

TEST(PixelBuffer, GivesItsPixelsOnlyWhileItIsLocked) {
    const std::shared_ptr<std::uint8_t> pixels(new std::uint8_t[8](), std::default_delete<std::uint8_t[]>());
    const CVPixelBufferRef buffer = CVPixelBufferCreateWithBytes(1, 1, 32, 8, pixels);
    EXPECT_EQ(CVPixelBufferGetBaseAddress(buffer.get()), nullptr);
    EXPECT_EQ(CVPixelBufferUnlockBaseAddress(buffer.get(), 0), kCVReturnInvalidArgument);
    EXPECT_EQ(CVPixelBufferLockBaseAddress(buffer.get(), 1), kCVReturnSuccess);
    EXPECT_EQ(CVPixelBufferGetBaseAddress(buffer.get()), pixels.get());
    EXPECT_EQ(CVPixelBufferUnlockBaseAddress(buffer.get(), 1), kCVReturnSuccess);
    EXPECT_EQ(CVPixelBufferGetBaseAddress(buffer.get()), nullptr);
    EXPECT_EQ(CVPixelBufferGetBytesPerRow(buffer.get()), 8u);
}

TEST(PixelBuffer, IsNotMadeOfNothing) {
    const std::shared_ptr<std::uint8_t> pixels(new std::uint8_t[8](), std::default_delete<std::uint8_t[]>());
    EXPECT_EQ(CVPixelBufferCreateWithBytes(0, 1, 32, 8, pixels), nullptr);
    EXPECT_EQ(CVPixelBufferCreateWithBytes(1, 0, 32, 8, pixels), nullptr);
    EXPECT_EQ(CVPixelBufferCreateWithBytes(2, 1, 32, 7, pixels), nullptr);
    EXPECT_EQ(CVPixelBufferCreateWithBytes(2, 1, 32, 8, nullptr), nullptr);
    EXPECT_NE(CVPixelBufferCreateWithBytes(2, 1, 32, 8, pixels), nullptr);
}

TEST(PixelBuffer, NoneAnswersToo) {
    EXPECT_EQ(CVPixelBufferLockBaseAddress(nullptr, 1), kCVReturnInvalidArgument);
    EXPECT_EQ(CVPixelBufferUnlockBaseAddress(nullptr, 1), kCVReturnInvalidArgument);
    EXPECT_EQ(CVPixelBufferGetBaseAddress(nullptr), nullptr);
    EXPECT_EQ(CVPixelBufferGetWidth(nullptr), 0u);
    EXPECT_EQ(CVPixelBufferGetHeight(nullptr), 0u);
    EXPECT_EQ(CVPixelBufferGetBytesPerRow(nullptr), 0u);
    EXPECT_EQ(CVPixelBufferGetPixelFormatType(nullptr), 0u);
    EXPECT_EQ(CMSampleBufferGetImageBuffer(nullptr), nullptr);
    EXPECT_EQ(CMSampleBufferGetGenerations(nullptr), CMSampleBufferGenerations());
    EXPECT_EQ(CMSampleBufferGetDisplayRect(nullptr), CGRect());
}

TEST(MediaTime, IsRoundedToItsTimescale) {
    EXPECT_EQ(CMTimeMakeWithSeconds(1.0 / 35, 10000), CMTimeMake(286, 10000));
    EXPECT_EQ(CMTimeMakeWithSeconds(1.0 / 30, 10000), CMTimeMake(333, 10000));
    EXPECT_EQ(CMTimeMakeWithSeconds(std::numeric_limits<double>::infinity(), 10000), CMTime());
    EXPECT_EQ(CMTimeMakeWithSeconds(std::nan(""), 10000), CMTime());
    EXPECT_EQ(CMTimeMakeWithSeconds(1e300, 10000).value, std::numeric_limits<int>::max());
}
