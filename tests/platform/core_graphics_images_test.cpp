// SPDX-License-Identifier: Apache-2.0
#include "platform/core_graphics_images.h"

#include "platform/simulated/scene.h"
#include "tests/platform/bitmap_tools.h"
#include "tests/support/test_effort.h"
#include "tests/support/threads.h"

#include <gtest/gtest.h>

#include <cmath>
#include <iostream>
#include <random>
#include <utility>

using namespace platform;

namespace {

constexpr std::uint32_t RED = 0xFF0000;
constexpr std::uint32_t GREEN = 0x00FF00;
constexpr std::uint32_t BLUE = 0x0000FF;
constexpr Colour NOTHING{0, 0, 0, 0};

CGRect Rect(float x, float y, float width, float height) {
    return {{x, y}, {width, height}};
}

/// A simulated desktop in force for the length of a scope.
class CServed {
public:
    explicit CServed(const Scene& scene) : m_server(scene.Serve()), m_former(ReplaceWindowServer(m_server)) {}
    ~CServed() { ReplaceWindowServer(m_former); }
    CServed(const CServed&) = delete;
    CServed& operator=(const CServed&) = delete;

    SimulatedWindowServer* operator->() const { return m_server.get(); }

private:
    const std::shared_ptr<SimulatedWindowServer> m_server;
    const std::shared_ptr<WindowServer> m_former;
};

CGImageRef Image(const CGRect& rect, const std::vector<CGWindowID>& windows,
                 unsigned options = kCGWindowImageBoundsIgnoreFraming) {
    return CGWindowListCreateImageFromArray(rect, windows, options);
}

CGWindowImageRef Take(const CGRect& rect, const std::vector<CGWindowID>& windows) {
    return CGWindowListTakeImage(rect, windows, kCGWindowImageBoundsIgnoreFraming, true);
}

Scene TwoWindows() {
    return Scene()
        .Display(0, 0, 100, 60)
        .App(100, "Editor")
        .Window(1)
        .At(10, 10, 40, 30)
        .Colour(RED)
        .Window(2)
        .At(30, 20, 40, 30)
        .Colour(GREEN);
}

Colour Seen(const CGImageRef& image, int x, int y) {
    return image != nullptr ? PixelOf(*image, x, y) : Colour{-1, -1, -1, -1};
}

} // namespace

TEST(WindowImage, StacksTheListedWindowsAsTheyStandWhateverTheOrderOfTheList) {
    const CServed desktop(TwoWindows());
    for (const std::vector<CGWindowID>& list : {std::vector<CGWindowID>{1, 2}, {2, 1}, {1, 2, 2, 1, 99}}) {
        const CGImageRef image = Image(Rect(0, 0, 100, 60), list);
        ASSERT_NE(image, nullptr);
        EXPECT_EQ(image->width, 100);
        EXPECT_EQ(image->height, 60);
        EXPECT_EQ(Seen(image, 9, 10), NOTHING);
        EXPECT_EQ(Seen(image, 10, 10), (Colour{255, 0, 0, 255}));
        EXPECT_EQ(Seen(image, 30, 20), (Colour{0, 255, 0, 255})) << "the front one covers";
        EXPECT_EQ(Seen(image, 29, 39), (Colour{255, 0, 0, 255}));
        EXPECT_EQ(Seen(image, 69, 49), (Colour{0, 255, 0, 255}));
        EXPECT_EQ(Seen(image, 70, 49), NOTHING);
    }
}

TEST(WindowImage, ShowsAListedWindowWholeUnderOneThatIsNot) {
    const CServed desktop(TwoWindows());
    const CGImageRef image = Image(Rect(10, 10, 40, 30), {1});
    for (int y = 0; y < 30; ++y) {
        for (int x = 0; x < 40; ++x)
            ASSERT_EQ(Seen(image, x, y), (Colour{255, 0, 0, 255})) << x << "," << y;
    }
}

TEST(WindowImage, ClipsToTheRectangle) {
    const CServed desktop(TwoWindows());
    const CGImageRef image = Image(Rect(20, 15, 20, 10), {1, 2});
    ASSERT_NE(image, nullptr);
    EXPECT_EQ(image->width, 20);
    EXPECT_EQ(image->height, 10);
    EXPECT_EQ(Seen(image, 0, 0), (Colour{255, 0, 0, 255}));
    EXPECT_EQ(Seen(image, 9, 9), (Colour{255, 0, 0, 255}));
    EXPECT_EQ(Seen(image, 10, 5), (Colour{0, 255, 0, 255}));
}

TEST(WindowImage, DrawsNothingOutsideItsPlaceInAContext) {
    const CServed desktop(TwoWindows());
    const CGWindowImageRef image = Take(Rect(20, 15, 20, 10), {1, 2});
    Canvas canvas(40, 40, kCGImageAlphaNoneSkipLast);
    EXPECT_TRUE(CGContextDrawWindowImage(canvas.Get(), Rect(10, 10, 20, 10), image.get()));
    for (int y = 0; y < 40; ++y) {
        for (int x = 0; x < 40; ++x) {
            const bool inside = x >= 10 && x < 30 && y >= 20 && y < 30;
            ASSERT_EQ(canvas.At(x, y).alpha, inside ? 255 : 0) << x << "," << y;
        }
    }
    CGContextFillRect(canvas.Get(), Rect(0, 0, 40, 40));
    EXPECT_EQ(canvas.At(0, 0).alpha, 255) << "the clip has ended";
}

TEST(WindowImage, FadesAWindowByItsAlpha) {
    const CServed desktop(Scene()
                              .Display(0, 0, 20, 20)
                              .Window(1)
                              .At(0, 0, 20, 20)
                              .Colour(RED)
                              .Window(2)
                              .At(0, 0, 10, 20)
                              .Colour(BLUE)
                              .Alpha(0.5F));
    const CGImageRef image = Image(Rect(0, 0, 20, 20), {1, 2});
    EXPECT_EQ(Seen(image, 15, 5), (Colour{255, 0, 0, 255}));
    EXPECT_NEAR(Seen(image, 5, 5).red, 127, 1);
    EXPECT_NEAR(Seen(image, 5, 5).blue, 128, 1);
    EXPECT_EQ(Seen(image, 5, 5).alpha, 255);
    const CGImageRef alone = Image(Rect(0, 0, 10, 20), {2});
    EXPECT_EQ(Seen(alone, 5, 5), (Colour{0, 0, 128, 128}));
}

TEST(WindowImage, HasThePixelsOfItsFinestPicture) {
    const CServed desktop(Scene()
                              .Display(0, 0, 50, 40)
                              .Scale(2)
                              .Display(50, 0, 50, 40)
                              .Window(1)
                              .At(0, 0, 50, 40)
                              .Colour(RED)
                              .Window(2)
                              .At(60, 0, 30, 20)
                              .Colour(GREEN));
    const CGImageRef fine = Image(Rect(0, 0, 100, 40), {1, 2});
    ASSERT_NE(fine, nullptr);
    EXPECT_EQ(fine->width, 200);
    EXPECT_EQ(fine->height, 80);
    EXPECT_EQ(Seen(fine, 99, 79), (Colour{255, 0, 0, 255}));
    EXPECT_EQ(Seen(fine, 120, 39), (Colour{0, 255, 0, 255}));
    EXPECT_EQ(Seen(fine, 119, 39), NOTHING);
    const CGImageRef coarse = Image(Rect(60, 0, 30, 20), {2});
    ASSERT_NE(coarse, nullptr);
    EXPECT_EQ(coarse->width, 30);
}

TEST(WindowImage, ShowsShadowsOnlyWithTheDefaultOption) {
    const CServed desktop(Scene().Display(0, 0, 60, 60).Window(1).At(20, 20, 20, 20).Colour(RED).Shadow(5));
    const CGImageRef framed = Image(Rect(0, 0, 60, 60), {1}, kCGWindowImageDefault);
    const CGImageRef bare = Image(Rect(0, 0, 60, 60), {1}, kCGWindowImageBoundsIgnoreFraming);
    EXPECT_NE(Seen(framed, 17, 30).alpha, 0);
    EXPECT_EQ(Seen(framed, 14, 30), NOTHING);
    EXPECT_EQ(Seen(bare, 17, 30), NOTHING);
    EXPECT_EQ(Seen(bare, 20, 30), (Colour{255, 0, 0, 255}));
}

TEST(WindowImage, OfOneWindowThatFillsItIsNotCopied) {
    const CServed desktop(Scene()
                              .Display(0, 0, 60, 60)
                              .Window(1)
                              .At(0, 0, 60, 60)
                              .Colour(RED)
                              .Window(2)
                              .At(-5, -5, 80, 80)
                              .Colour(GREEN)
                              .Format(PixelFormat::BGRX, 8));
    const auto sourceOf = [](CGWindowID window) {
        WindowPictureRequest request;
        request.windows = {window};
        request.rect = Rect(0, 0, 60, 60);
        request.deadline = CmSteadyNow() + DEFAULT_IMAGE_DEADLINE;
        return CurrentWindowServer()->TakeWindowPicture(request).picture->layers.front().picture;
    };
    const CGImageRef whole = Image(Rect(0, 0, 60, 60), {1});
    EXPECT_EQ(whole->pixels, sourceOf(1)->pixels);
    const CGImageRef part = Image(Rect(0, 0, 60, 60), {1, 2});
    const PicturePtr front = sourceOf(2);
    EXPECT_EQ(part->pixels, front->pixels + 5 * front->stride + 5 * 4) << "the one behind is hidden";
    EXPECT_EQ(part->width, 60);
    EXPECT_EQ(Seen(part, 59, 59), (Colour{0, 255, 0, part->pixels[3]}));
    const CGImageRef halfPoint = Image(Rect(0.5F, 0, 50, 50), {1});
    EXPECT_NE(halfPoint->pixels, sourceOf(1)->pixels);
}

TEST(WindowImage, IsOpaqueOnlyIfOneOpaqueWindowCoversTheRectangle) {
    const CServed desktop(Scene()
                              .Display(0, 0, 60, 60)
                              .Window(1)
                              .At(0, 0, 60, 60)
                              .Colour(RED)
                              .Format(PixelFormat::BGRX)
                              .Window(2)
                              .At(0, 0, 60, 60)
                              .Colour(RED)
                              .Window(3)
                              .At(0, 0, 60, 60)
                              .Colour(RED)
                              .Format(PixelFormat::BGRX)
                              .Alpha(0.99F));
    EXPECT_TRUE(CGWindowImageIsOpaque(Take(Rect(0, 0, 60, 60), {1}).get()));
    EXPECT_TRUE(CGWindowImageIsOpaque(Take(Rect(0, 0, 60, 60), {1, 2, 3}).get()));
    EXPECT_FALSE(CGWindowImageIsOpaque(Take(Rect(0, 0, 60.5F, 60), {1}).get()));
    EXPECT_FALSE(CGWindowImageIsOpaque(Take(Rect(0, 0, 60, 60), {2}).get())) << "it may hold holes";
    EXPECT_FALSE(CGWindowImageIsOpaque(Take(Rect(0, 0, 60, 60), {3}).get()));
    EXPECT_FALSE(CGWindowImageIsOpaque(nullptr));
}

TEST(WindowImage, IsNullForNoWindowAndNoArea) {
    const CServed desktop(TwoWindows());
    const float nan = std::nanf("");
    EXPECT_EQ(Image(Rect(0, 0, 100, 60), {}), nullptr);
    EXPECT_EQ(Image(Rect(0, 0, 100, 60), {77}), nullptr);
    for (const CGRect& rect : {Rect(0, 0, 0, 60), Rect(0, 0, 100, -1), Rect(nan, 0, 1, 1), Rect(0, 0, nan, 1),
                               Rect(0, 0, INFINITY, 1), Rect(0, 0, 1e9F, 1)})
        EXPECT_EQ(Image(rect, {1, 2}), nullptr);
    EXPECT_EQ(CGWindowImageCreateImage(nullptr), nullptr);
    EXPECT_EQ(CGWindowImageGetWidth(nullptr), 0);
}

TEST(WindowImage, IsTransparentWhereTheWindowsShowNothing) {
    const CServed desktop(Scene()
                              .Display(0, 0, 20, 20)
                              .Window(1)
                              .At(0, 0, 20, 20)
                              .Unpainted()
                              .Window(2)
                              .At(50, 50, 20, 20)
                              .Colour(RED)
                              .Window(3)
                              .At(0, 0, 20, 20)
                              .Colour(RED)
                              .Unshared());
    const CGImageRef image = Image(Rect(0, 0, 20, 20), {1, 2, 3});
    ASSERT_NE(image, nullptr);
    EXPECT_EQ(Bytes(image->pixels, image->pixels + 20 * 20 * 4), Bytes(20 * 20 * 4));
}

TEST(WindowImage, IsNullWhateverWayTheServerFails) {
    const CServed desktop(TwoWindows());
    for (const PictureOutcome outcome :
         {PictureOutcome::Lost, PictureOutcome::Nothing, PictureOutcome::Gone, PictureOutcome::Timeout,
          PictureOutcome::Unsupported, PictureOutcome::Refused, PictureOutcome::Failed}) {
        desktop->FailNext(SimulatedOperation::TakeWindowPicture, outcome);
        EXPECT_EQ(Image(Rect(0, 0, 100, 60), {1, 2}), nullptr);
        EXPECT_NE(Image(Rect(0, 0, 100, 60), {1, 2}), nullptr) << "the next one is whole again";
    }
    desktop->Lose();
    EXPECT_EQ(Image(Rect(0, 0, 100, 60), {1, 2}), nullptr);
}

TEST(WindowImage, IsAskedForAgainTwiceWhenTheStackMovedUnderIt) {
    const CServed desktop(TwoWindows());
    const auto calls = [&] { return desktop->CallsOf(SimulatedOperation::TakeWindowPicture); };
    desktop->FailNth(SimulatedOperation::TakeWindowPicture, 1, PictureOutcome::Stale);
    desktop->FailNth(SimulatedOperation::TakeWindowPicture, 2, PictureOutcome::Stale);
    EXPECT_NE(Image(Rect(0, 0, 100, 60), {1}), nullptr);
    EXPECT_EQ(calls(), 3u);
    desktop->FailAlways(SimulatedOperation::TakeWindowPicture, PictureOutcome::Stale);
    EXPECT_EQ(Image(Rect(0, 0, 100, 60), {1}), nullptr);
    EXPECT_EQ(calls(), 6u);
}

TEST(WindowImage, GivesUpAfterItsDeadline) {
    CManualClockScope clock;
    const CServed desktop(TwoWindows());
    desktop->DelayAlways(SimulatedOperation::TakeWindowPicture, std::chrono::seconds(5));
    CTally done;
    std::thread taker([&] {
        EXPECT_EQ(Image(Rect(0, 0, 100, 60), {1}), nullptr);
        done.Add();
    });
    const auto begun = std::chrono::steady_clock::now();
    while (done.Count() == 0 && std::chrono::steady_clock::now() - begun < PATIENCE) {
        clock->Advance(std::chrono::milliseconds(250));
        std::this_thread::yield();
    }
    taker.join();
}

TEST(WindowImage, LeavesOutALayerThatNobodyAskedFor) {
    const CServed desktop(TwoWindows());
    desktop->Lie(SimulatedLie::OneWindowTooMany);
    const CGImageRef image = Image(Rect(0, 0, 100, 60), {1});
    EXPECT_EQ(Seen(image, 40, 30), (Colour{255, 0, 0, 255}));
    EXPECT_EQ(Seen(image, 60, 45), NOTHING);
}

TEST(WindowImage, OfAServerWithoutAListOfWindowsNeedsAnAskerWhoKeepsNothingOut) {
    const CServed desktop(TwoWindows().Background(BLUE));
    desktop->SetCapability(Capability::Windows, Availability::No);
    const std::vector<CGWindowID> display{CurrentWindowServer()->GetWindows()->Windows().front().id};
    EXPECT_EQ(CGWindowListTakeImage(Rect(0, 0, 100, 60), display, 1, true), nullptr);
    EXPECT_EQ(Image(Rect(0, 0, 100, 60), display), nullptr);
    const CGWindowImageRef image = CGWindowListTakeImage(Rect(0, 0, 100, 60), display, 1, false);
    Canvas canvas(100, 60, kCGImageAlphaNoneSkipLast);
    EXPECT_TRUE(CGContextDrawWindowImage(canvas.Get(), Rect(0, 0, 100, 60), image.get()));
    EXPECT_EQ(canvas.At(15, 15), (Colour{255, 0, 0, 255}));
    EXPECT_EQ(canvas.At(5, 5), (Colour{0, 0, 255, 255}));
}

TEST(WindowImage, KeepsWhatItShowsWhenTheDesktopGoesOn) {
    const CServed desktop(TwoWindows());
    const CGWindowImageRef image = Take(Rect(0, 0, 100, 60), {1, 2});
    desktop->CloseWindow(1);
    desktop->SetContent(2, SimulatedContent::Colour(BLUE));
    const CGImageRef block = CGWindowImageCreateImage(image.get());
    EXPECT_EQ(Seen(block, 10, 10), (Colour{255, 0, 0, 255}));
    EXPECT_EQ(Seen(block, 60, 45), (Colour{0, 255, 0, 255}));
}

// ---- Against a slow painter

namespace {

struct PaintedWindow {
    CGWindowID id;
    int x, y, width, height;
    float alpha;
    std::uint32_t seed;
    bool listed;
    bool unshared;
};

/// The pixels of a window: some opaque, some transparent, some half.
SimulatedArgb PixelAt(std::uint32_t seed, int x, int y) {
    const auto mixed = static_cast<std::uint32_t>(x * 7919 + y * 104729) * 2654435761u + seed;
    const std::uint32_t alpha = mixed % 5 == 0 ? 0 : mixed % 3 == 0 ? 128 : 255;
    return alpha << 24 | (mixed >> 4 & 0xFFFFFF);
}

/// Red, green, blue, alpha of what stands at a point, premultiplied, from 0 to 255: windows from the back to
/// the front, each laid over what is there.
std::array<double, 4> SlowPixel(const std::vector<PaintedWindow>& backToFront, int x, int y) {
    std::array<double, 4> at{};
    for (const PaintedWindow& window : backToFront) {
        const int inX = x - window.x;
        const int inY = y - window.y;
        if (!window.listed || window.unshared || inX < 0 || inY < 0 || inX >= window.width ||
            inY >= window.height)
            continue;
        const SimulatedArgb pixel = PixelAt(window.seed, inX, inY);
        const double alpha = (pixel >> 24) / 255.0 * static_cast<double>(window.alpha);
        const std::array<double, 4> over{(pixel >> 16 & 255) * alpha, (pixel >> 8 & 255) * alpha,
                                         (pixel & 255) * alpha, 255 * alpha};
        for (std::size_t i = 0; i < at.size(); ++i)
            at[i] = over[i] + at[i] * (1 - alpha);
    }
    return at;
}

class RandomWindows {
public:
    explicit RandomWindows(unsigned seed) : m_random(seed) {}

    std::vector<PaintedWindow> Make() {
        std::vector<PaintedWindow> windows;
        const int count = Between(1, 7);
        for (int i = 0; i < count; ++i)
            windows.push_back(
                {static_cast<CGWindowID>(i + 1), Between(-20, 80), Between(-20, 50), Between(1, 70),
                 Between(1, 50), Between(0, 2) != 0 ? 1.0F : 0.25F * static_cast<float>(Between(0, 4)),
                 static_cast<std::uint32_t>(m_random()), Between(0, 3) != 0, Between(0, 5) == 0});
        windows.front().listed = true;
        return windows;
    }
    int Between(int low, int high) { return std::uniform_int_distribution<int>(low, high)(m_random); }

private:
    std::mt19937 m_random;
};

Scene SceneOf(const std::vector<PaintedWindow>& windows) {
    Scene scene;
    scene.Display(0, 0, 100, 60);
    for (const PaintedWindow& window : windows) {
        scene.Window(window.id)
            .At(static_cast<float>(window.x), static_cast<float>(window.y), static_cast<float>(window.width),
                static_cast<float>(window.height))
            .Alpha(window.alpha)
            .Showing(SimulatedContent::Painted(
                [seed = window.seed](int x, int y) { return PixelAt(seed, x, y); }));
        if (window.unshared)
            scene.Unshared();
    }
    return scene;
}

/// How far the farthest component is from the slow painter's.
double WorstDifference(const CGImage& image, const std::vector<PaintedWindow>& windows, int left, int top) {
    double worst = 0;
    for (int y = 0; y < image.height; ++y) {
        for (int x = 0; x < image.width; ++x) {
            const Colour got = PixelOf(image, x, y);
            const std::array<double, 4> wanted = SlowPixel(windows, left + x, top + y);
            worst = std::max({worst, std::abs(got.red - wanted[0]), std::abs(got.green - wanted[1]),
                              std::abs(got.blue - wanted[2]), std::abs(got.alpha - wanted[3])});
        }
    }
    return worst;
}

} // namespace

TEST(WindowImage, EqualsWhatASlowPainterMakesOfRandomStacks) {
    constexpr unsigned SEED = 20260;
    const int rounds = 150 * TestEffort();
    std::cout << rounds << " stacks, seed " << SEED << "\n";
    RandomWindows random(SEED);
    int blended = 0;
    for (int round = 0; round < rounds; ++round) {
        const std::vector<PaintedWindow> windows = random.Make();
        const CServed desktop(SceneOf(windows));
        std::vector<CGWindowID> list;
        for (const PaintedWindow& window : windows) {
            if (window.listed)
                list.push_back(window.id);
        }
        const int left = random.Between(-10, 40);
        const int top = random.Between(-10, 30);
        const CGImageRef image = Image(Rect(static_cast<float>(left), static_cast<float>(top), 50, 30), list);
        ASSERT_NE(image, nullptr) << "round " << round;
        // Each layer rounds its components twice.
        ASSERT_LE(WorstDifference(*image, windows, left, top), 1.0 + static_cast<double>(windows.size()))
            << "round " << round;
        blended += list.size() > 1 ? 1 : 0;
    }
    EXPECT_GT(blended, rounds / 3) << "few stacks were stacks";
}
