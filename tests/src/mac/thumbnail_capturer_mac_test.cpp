// SPDX-License-Identifier: Apache-2.0
#include "src/mac/thumbnail_capturer_mac.h"

#include "platform/core_graphics.h"
#include "tests/src/mac/backend_tools.h"
#include "tests/src/thumbnail_tools.h"

#include <gtest/gtest.h>

#include <sys/types.h>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <vector>

using namespace platform;

// Pictures of windows and applications on a simulated desktop, and which windows stand for applications.

namespace {

constexpr pid_t EDITOR = 5'000'100;
constexpr pid_t MAIL = 5'000'050;
constexpr std::uint32_t RED = 0xFF0000;
constexpr std::uint32_t GREEN = 0x00FF80;
constexpr std::uint32_t BLUE = 0x0000FF;

std::uint32_t At(const ImageData& image, int x, int y) {
    const unsigned char* const pixel =
        image.data + static_cast<std::ptrdiff_t>(y) * image.lineBytes + static_cast<std::ptrdiff_t>(x) * 4;
    return static_cast<std::uint32_t>(pixel[0]) << 16 | static_cast<std::uint32_t>(pixel[1]) << 8 | pixel[2];
}

/// The one colour of all pixels, or all bits set when there are several.
std::uint32_t ColourOf(const ImageData& image) {
    const std::uint32_t colour = At(image, 0, 0);
    for (int y = 0; y < image.height; ++y) {
        for (int x = 0; x < image.width; ++x) {
            if (At(image, x, y) != colour)
                return 0xFFFFFFFF;
        }
    }
    return colour;
}

void ExpectSize(const ImageData& image, int width, int height) {
    EXPECT_EQ(image.format, SHARE_FRAME_FORMAT_RGBA);
    EXPECT_EQ(image.width, width);
    EXPECT_EQ(image.height, height);
    EXPECT_EQ(image.lineBytes, width * 4);
    EXPECT_NE(image.data, nullptr);
}

Scene EmptyDesk() {
    return Scene().Display(0, 0, 400, 300);
}

class ThumbnailCapturer : public testing::Test {
protected:
    bool Capture(unsigned window) { return capturer.captureWindowImage(window, image); }
    bool CaptureApp(pid_t pid) { return capturer.captureAppImage(static_cast<unsigned>(pid), image); }

    CThumbnailCapturerMac capturer;
    ImageData image{};
};

} // namespace

// ---- A window

TEST_F(ThumbnailCapturer, ShowsAWindowInItsSizeAndColoursRedFirst) {
    const CServedScene desk(EmptyDesk().App(EDITOR, "Editor").Window(1).At(10, 20, 30, 20).Colour(0x102030));
    EXPECT_TRUE(capturer.init());
    ASSERT_TRUE(Capture(1));
    ExpectSize(image, 30, 20);
    EXPECT_EQ(ColourOf(image), 0x102030u);
    capturer.stop();
}

TEST_F(ThumbnailCapturer, ShowsTheTopOfTheWindowFirst) {
    const auto halves = SimulatedContent::Painted([](int, int y) { return Opaque(y < 10 ? RED : BLUE); });
    const CServedScene desk(EmptyDesk().App(EDITOR, "Editor").Window(1).At(10, 20, 30, 20).Showing(halves));
    ASSERT_TRUE(Capture(1));
    EXPECT_EQ(At(image, 5, 2), RED);
    EXPECT_EQ(At(image, 5, 18), BLUE);
}

TEST_F(ThumbnailCapturer, ShowsACoveredWindowWholeAndAlone) {
    const CServedScene desk(EmptyDesk()
                                .App(EDITOR, "Editor")
                                .Window(1)
                                .At(10, 10, 50, 50)
                                .Colour(GREEN)
                                .App(MAIL, "Mail")
                                .Window(2)
                                .At(0, 0, 100, 30)
                                .Colour(RED));
    ASSERT_TRUE(Capture(1));
    EXPECT_EQ(ColourOf(image), GREEN);
}

TEST_F(ThumbnailCapturer, MakesPicturesInPointsOnADenseDisplay) {
    const CServedScene desk(Scene()
                                .Display(0, 0, 400, 300)
                                .Scale(2)
                                .App(EDITOR, "Editor")
                                .Window(1)
                                .At(10, 10, 50, 40)
                                .Colour(GREEN));
    ASSERT_TRUE(Capture(1));
    ExpectSize(image, 50, 40);
    EXPECT_EQ(ColourOf(image), GREEN);
}

TEST_F(ThumbnailCapturer, CutsAFractionalSize) {
    const CServedScene desk(
        EmptyDesk().App(EDITOR, "Editor").Window(1).At(10, 10, 301.5F, 200.5F).Colour(GREEN));
    ASSERT_TRUE(Capture(1));
    ExpectSize(image, 301, 200);
    EXPECT_EQ(image.lineBytes, 1204);
    EXPECT_EQ(At(image, 0, 0), GREEN);
    // Rows lie as far apart as the fractional width says.
    unsigned char lastPixel[3];
    std::memcpy(lastPixel, image.data + std::ptrdiff_t{199} * 1206 + std::ptrdiff_t{300} * 4, 3);
    EXPECT_EQ(lastPixel[0], 0x00);
    EXPECT_EQ(lastPixel[1], 0xFF);
    EXPECT_EQ(lastPixel[2], 0x80);
}

TEST_F(ThumbnailCapturer, KeepsItsMemoryForASmallerWindow) {
    const CServedScene desk(EmptyDesk()
                                .App(EDITOR, "Editor")
                                .Window(1)
                                .At(0, 0, 200, 100)
                                .Colour(GREEN)
                                .Window(2)
                                .At(0, 0, 20, 10)
                                .Colour(RED));
    ASSERT_TRUE(Capture(1));
    const unsigned char* const memory = image.data;
    ASSERT_TRUE(Capture(2));
    ExpectSize(image, 20, 10);
    EXPECT_EQ(ColourOf(image), RED);
    EXPECT_EQ(image.data, memory);
    // Behind the small picture the large one is still there: nothing was given up.
    EXPECT_EQ(memory[199 * 4 + 99 * 800 + 1], 0xFF);
    ASSERT_TRUE(Capture(1));
    EXPECT_EQ(image.data, memory);
}

TEST_F(ThumbnailCapturer, LetsNoFormerWindowShowThroughATranslucentOne) {
    const auto half = SimulatedContent::Painted([](int, int) { return 0x8000FF00U; });
    const auto nothing = SimulatedContent::Painted([](int, int) { return 0U; });
    const CServedScene desk(EmptyDesk()
                                .App(EDITOR, "Editor")
                                .Window(1)
                                .At(0, 0, 40, 40)
                                .Colour(RED)
                                .Window(2)
                                .At(0, 0, 40, 40)
                                .Showing(half)
                                .Window(3)
                                .At(0, 0, 40, 40)
                                .Showing(nothing));
    for (const unsigned window : {2u, 3u}) {
        ASSERT_TRUE(Capture(1));
        ASSERT_EQ(ColourOf(image), RED);
        ASSERT_TRUE(Capture(window));
        EXPECT_EQ(ColourOf(image) & RED, 0u) << "window " << window;
    }
}

TEST_F(ThumbnailCapturer, FailsForAWindowThatIsNotThereAndLeavesItsMemoryAlone) {
    const CServedScene desk(
        EmptyDesk().App(EDITOR, "Editor").Window(1).At(0, 0, 40, 40).Colour(RED).Window(2).At(0, 0, 40, 40));
    ASSERT_TRUE(Capture(1));
    const ImageData former = image;
    EXPECT_FALSE(Capture(77));
    EXPECT_FALSE(Capture(0));
    desk->CloseWindow(2);
    EXPECT_FALSE(Capture(2));
    EXPECT_EQ(ColourOf(former), RED);
}

TEST_F(ThumbnailCapturer, ShowsNothingOfAWindowThatGivesItsPixelsToNobody) {
    const CServedScene desk(EmptyDesk()
                                .App(EDITOR, "Editor")
                                .Window(1)
                                .At(0, 0, 40, 40)
                                .Colour(RED)
                                .Unshared()
                                .Window(2)
                                .At(0, 0, 40, 40)
                                .Colour(GREEN));
    ASSERT_TRUE(Capture(2));
    if (Capture(1)) {
        EXPECT_EQ(ColourOf(image), 0u);
    }
    desk->SetSharing(1, SharingState::ReadOnly);
    ASSERT_TRUE(Capture(1));
    EXPECT_EQ(ColourOf(image), RED);
}

TEST_F(ThumbnailCapturer, ShowsAMinimisedWindowAsItWas) {
    const CServedScene desk(EmptyDesk().App(EDITOR, "Editor").Window(1).At(10, 20, 40, 30).Colour(GREEN));
    ASSERT_TRUE(Capture(1));
    desk->SetOnScreen(1, false);
    ASSERT_TRUE(Capture(1));
    ExpectSize(image, 40, 30);
    EXPECT_EQ(ColourOf(image), GREEN);
    EXPECT_FALSE(CaptureApp(EDITOR)) << "it stands for nobody";
}

TEST_F(ThumbnailCapturer, FailsWhenTheWindowServerFails) {
    const CServedScene desk(EmptyDesk().App(EDITOR, "Editor").Window(1).At(0, 0, 40, 40).Colour(RED));
    desk->FailNext(SimulatedOperation::TakeWindowPicture);
    EXPECT_FALSE(Capture(1));
    EXPECT_TRUE(Capture(1));
    desk->Lose();
    EXPECT_FALSE(Capture(1));
    EXPECT_FALSE(CaptureApp(EDITOR));
}

// ---- An application

TEST_F(ThumbnailCapturer, TakesTheLargestWindowOfAnApplication) {
    const CServedScene desk(EmptyDesk()
                                .App(EDITOR, "Editor")
                                .Window(1)
                                .At(0, 0, 50, 50)
                                .Window(2)
                                .At(0, 0, 60, 50)
                                .Colour(GREEN)
                                .Window(3)
                                .At(0, 0, 40, 50)
                                .App(MAIL, "Mail")
                                .Window(4)
                                .At(0, 0, 300, 200));
    ASSERT_TRUE(CaptureApp(EDITOR));
    ExpectSize(image, 60, 50);
    EXPECT_EQ(ColourOf(image), GREEN);
}

TEST_F(ThumbnailCapturer, TakesTheFrontOneOfEqualWindows) {
    const CServedScene desk(
        EmptyDesk().App(EDITOR, "Editor").Window(1).At(0, 0, 200, 50).Window(2).At(0, 0, 100, 100));
    ASSERT_TRUE(CaptureApp(EDITOR));
    ExpectSize(image, 100, 100);
    desk->RaiseWindow(1);
    ASSERT_TRUE(CaptureApp(EDITOR));
    ExpectSize(image, 200, 50);
}

TEST_F(ThumbnailCapturer, FailsForAnApplicationWithoutAWindowWorthShowing) {
    const CServedScene desk(EmptyDesk()
                                .App(EDITOR, "Editor")
                                .Window(1)
                                .At(0, 0, 0, 100)
                                .App(MAIL, "Mail")
                                .Window(2)
                                .At(0, 0, 100, 100)
                                .OffScreen()
                                .Window(3)
                                .At(0, 0, 100, 100)
                                .Level(CGWindowLevelForKey(kCGDockWindowLevelKey))
                                .Window(4)
                                .At(0, 0, 100, 100)
                                .Level(-1));
    EXPECT_FALSE(CaptureApp(EDITOR));
    EXPECT_FALSE(CaptureApp(MAIL));
    EXPECT_FALSE(CaptureApp(1));
}

// ---- The windows that stand for all applications

namespace {

/// Its pictures tell which window was chosen: they are as wide as its id.
class ThumbnailChoice : public testing::Test {
protected:
    ThumbnailPlan plan;
    CPlannedEngine engine{plan};
    CThumbnailLog log;
};

} // namespace

TEST_F(ThumbnailChoice, IsTheLargestWindowOfEachApplicationInTheOrderOfTheirIds) {
    const CServedScene desk(EmptyDesk()
                                .App(EDITOR, "Editor")
                                .Window(1)
                                .At(0, 0, 200, 50)
                                .Window(2)
                                .At(0, 0, 100, 100)
                                .Window(3)
                                .At(0, 0, 300, 300)
                                .Level(CGWindowLevelForKey(kCGDockWindowLevelKey))
                                .Window(4)
                                .At(0, 0, 300, 300)
                                .Level(-1)
                                .App(MAIL, "Mail")
                                .Window(5)
                                .At(0, 0, 10, 10)
                                .Window(6)
                                .At(0, 0, 20, 10));
    EXPECT_TRUE(engine.request(&log));
    ASSERT_TRUE(plan.ended.Reaches(1));
    EXPECT_EQ(log.Calls(), (ThumbnailCalls{"app 5000050 6x1", "app 5000100 2x1 last"}));
}

TEST_F(ThumbnailChoice, TakesAnApplicationWithoutAnAreaToo) {
    const CServedScene desk(EmptyDesk().App(EDITOR, "Editor").Window(1).At(0, 0, 0, 50));
    EXPECT_TRUE(engine.request(&log));
    ASSERT_TRUE(plan.ended.Reaches(1));
    EXPECT_EQ(log.Calls(), ThumbnailCalls{"app 5000100 1x1 last"});
}

TEST_F(ThumbnailChoice, IsWhatAnEmptyListOfApplicationsMeans) {
    const CServedScene desk(EmptyDesk().App(EDITOR, "Editor").Window(1).At(0, 0, 20, 50));
    const unsigned id = MAIL;
    EXPECT_TRUE(engine.requestForApps(nullptr, 0, &log));
    ASSERT_TRUE(plan.ended.Reaches(1));
    EXPECT_TRUE(engine.requestForApps(nullptr, 3, &log));
    ASSERT_TRUE(plan.ended.Reaches(2));
    EXPECT_TRUE(engine.requestForApps(&id, 0, &log));
    ASSERT_TRUE(plan.ended.Reaches(3));
    EXPECT_EQ(log.Calls(), ThumbnailCalls(3, "app 5000100 1x1 last"));
}

TEST_F(ThumbnailChoice, IsMadeInTheMomentOfTheRequest) {
    const CServedScene desk(
        EmptyDesk().App(EDITOR, "Editor").Window(1).At(0, 0, 20, 50).Window(2).At(0, 0, 10, 10));
    CHeldCapture held(9);
    plan.capture = [&held](unsigned id) { return held(id); };
    CThumbnailLog occupant;
    EXPECT_TRUE(engine.RequestWindows({9}, occupant));
    ASSERT_TRUE(held.IsReached());
    EXPECT_TRUE(engine.request(&log));
    desk->CloseWindow(1);
    held.Release();
    ASSERT_TRUE(plan.ended.Reaches(1));
    EXPECT_EQ(log.Calls(), ThumbnailCalls{"app 5000100 1x1 last"});
}

TEST_F(ThumbnailChoice, OfNoWindowsIsAJobThatTellsNothing) {
    const CServedScene desk(EmptyDesk());
    EXPECT_TRUE(engine.request(&log));
    ASSERT_TRUE(plan.ended.Reaches(1));
    EXPECT_EQ(log.Calls(), ThumbnailCalls{});
}

// ---- The whole way

TEST(Thumbnails, OfAWindowThatClosesMeanwhileFailAndTheOthersCome) {
    const CServedScene desk(EmptyDesk()
                                .App(EDITOR, "Editor")
                                .Window(1)
                                .At(0, 0, 20, 50)
                                .Window(2)
                                .At(0, 0, 30, 10)
                                .Window(3)
                                .At(0, 0, 40, 10));
    CThumbnailLog log([&desk](std::size_t count) {
        if (count == 1)
            desk->CloseWindow(2);
        return true;
    });
    CThumbnailCaptureEngine engine;
    const unsigned windows[] = {1, 2, 3};
    EXPECT_TRUE(engine.requestForWindows(windows, 3, &log));
    ASSERT_TRUE(log.lasts.Reaches(1));
    EXPECT_EQ(log.Calls(), (ThumbnailCalls{"window 1 20x50", "window 2 failed", "window 3 40x10 last"}));
}

TEST(Thumbnails, OfApplicationsWithoutAWindowFail) {
    const CServedScene desk(EmptyDesk().App(EDITOR, "Editor").Window(1).At(0, 0, 20, 50));
    CThumbnailLog log;
    CThumbnailCaptureEngine engine;
    const unsigned pids[] = {EDITOR, MAIL};
    EXPECT_TRUE(engine.requestForApps(pids, 2, &log));
    ASSERT_TRUE(log.lasts.Reaches(1));
    EXPECT_EQ(log.Calls(), (ThumbnailCalls{"app 5000100 20x50", "app 5000050 failed last"}));
}
