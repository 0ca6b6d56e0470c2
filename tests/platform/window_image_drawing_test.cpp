// SPDX-License-Identifier: Apache-2.0
#include "platform/window_image_drawing.h"

#include "platform/simulated/scene.h"
#include "tests/platform/bitmap_tools.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <utility>
#include <vector>

using namespace platform;

namespace {

constexpr std::uint32_t RED = 0xFF0000;
constexpr std::uint32_t GREEN = 0x00FF00;

CGRect Rect(float x, float y, float width, float height) {
    return {{x, y}, {width, height}};
}

SimulatedContent Block(const PixelRect& block) {
    return SimulatedContent::Painted([block](int x, int y) {
        const bool inside = x >= block.left && x < block.right && y >= block.top && y < block.bottom;
        return Opaque(inside ? 0xFF : 0);
    });
}

/// Two windows, drawn into a canvas of the desktop's size.
class WindowImageDrawings : public testing::Test {
protected:
    WindowImageDrawings() : m_former(ReplaceWindowServer(server)) {}
    ~WindowImageDrawings() override { ReplaceWindowServer(m_former); }

    CGWindowImageRef Take() {
        constexpr CGWindowID BOTH[] = {1, 2};
        return CGWindowListTakeImage(Rect(0, 0, 100, 60), BOTH, kCGWindowImageBoundsIgnoreFraming, true);
    }
    /// Of what there is now.
    WindowImageDrawing Now(const CGRect& place) {
        image = Take();
        WindowImageDrawing drawing;
        EXPECT_TRUE(drawing.Describe(canvas.Get(), place, image.get()));
        return drawing;
    }
    WindowImageDrawing Now() { return Now(Rect(0, 0, 100, 60)); }
    /// Nothing when all may be different.
    std::optional<PixelRegion> Changes(const WindowImageDrawing& before, const WindowImageDrawing& now) {
        PixelRegion changes;
        return now.AddChanges(before, image.get(), changes) ? std::optional(changes) : std::nullopt;
    }

    std::shared_ptr<SimulatedWindowServer> server = Scene()
                                                        .Display(0, 0, 100, 60)
                                                        .Window(1)
                                                        .At(0, 0, 100, 60)
                                                        .Colour(RED)
                                                        .Format(PixelFormat::BGRX)
                                                        .Window(2)
                                                        .At(30, 20, 40, 32)
                                                        .Colour(GREEN)
                                                        .Serve();
    Canvas canvas{100, 60, kCGImageAlphaNoneSkipLast};
    CGWindowImageRef image;

private:
    const std::shared_ptr<WindowServer> m_former;
};

} // namespace

TEST_F(WindowImageDrawings, AreEqualAsLongAsTheyLeaveTheSame) {
    const WindowImageDrawing before = Now();
    EXPECT_EQ(Now(), before);
    server->MoveWindow(2, {31, 20});
    EXPECT_NE(Now(), before);
    server->MoveWindow(2, {30, 20});
    EXPECT_EQ(Now(), before);
    server->SetAlpha(2, 0.5F);
    EXPECT_NE(Now(), before);
    server->SetAlpha(2, 1);
    server->SetContent(2, Block({0, 0, 1, 1}));
    EXPECT_NE(Now(), before);
}

TEST_F(WindowImageDrawings, TellWhereAWindowHasPaintedInPixelsOfTheContext) {
    const WindowImageDrawing before = Now();
    EXPECT_EQ(Changes(before, Now()), PixelRegion());
    server->SetContent(2, Block({4, 16, 8, 32}));
    const WindowImageDrawing after = Now();
    // The window was of one colour: the block and all around it are new.
    EXPECT_EQ(Changes(before, after), PixelRegion({30, 20, 70, 52}));
    server->SetContent(2, Block({6, 16, 8, 32}));
    EXPECT_EQ(Changes(after, Now()), PixelRegion({34, 36, 36, 52}));
}

TEST_F(WindowImageDrawings, CutChangesToWhatIsSeen) {
    const CGRect corner = Rect(-20, -10, 100, 60); // counted from the bottom: the top right corner is empty
    server->SetContent(1, Block({0, 0, 100, 16}));
    const WindowImageDrawing before = Now(corner);
    server->SetContent(1, Block({0, 0, 10, 16}));
    EXPECT_EQ(Changes(before, Now(corner)), PixelRegion({0, 10, 80, 26}));
}

TEST_F(WindowImageDrawings, TellNothingWhenMoreThanPixelsIsDifferent) {
    const std::vector<std::pair<const char*, std::function<void()>>> changes{
        {"place",
         [&] {
             server->MoveWindow(2, {31, 20});
         }},
        {"size", [&] { server->SetFrame(2, Rect(31, 20, 41, 32)); }},
        {"alpha", [&] { server->SetAlpha(2, 0.5F); }},
        {"number of windows", [&] { server->SetOnScreen(2, false), server->CloseWindow(2); }},
    };
    for (const auto& [what, change] : changes) {
        const WindowImageDrawing before = Now();
        change();
        EXPECT_EQ(Changes(before, Now()), std::nullopt) << what;
    }
    const WindowImageDrawing before = Now();
    EXPECT_EQ(Changes(before, Now(Rect(0, 1, 100, 60))), std::nullopt) << "place of the whole";
    EXPECT_EQ(Changes(before, Now(Rect(0, 0, 99, 60))), std::nullopt) << "scale of the whole";
}

TEST_F(WindowImageDrawings, TellNothingOfOneThatIsSeenThroughAnotherClip) {
    const WindowImageDrawing before = Now();
    Canvas smaller(100, 59, kCGImageAlphaNoneSkipLast);
    WindowImageDrawing other;
    ASSERT_TRUE(other.Describe(smaller.Get(), Rect(0, -1, 100, 60), image.get()));
    EXPECT_NE(other, before);
    EXPECT_EQ(Changes(before, other), std::nullopt);
}

TEST_F(WindowImageDrawings, TellTheRowsWhereAWindowThatIsScaledHasPainted) {
    const CGRect half = Rect(0, 0, 50, 30); // counted from the bottom: rows 30 to 60
    server->SetContent(2, Block({0, 0, 40, 12}));
    const WindowImageDrawing before = Now(half);
    EXPECT_EQ(Changes(before, Now(half)), PixelRegion());
    server->SetContent(2, Block({0, 0, 40, 8}));
    // That is told of rows 0 to 16. They go to rows 40 to 48, and some of those below look at them.
    EXPECT_EQ(Changes(before, Now(half)), PixelRegion({15, 40, 35, 51}));
}

TEST_F(WindowImageDrawings, AreDrawnInPartsOfWholeRowsWhereAnythingIsScaled) {
    const PixelRegion changes({20, 35, 30, 40});
    EXPECT_EQ(Now().PartFor(changes), changes);
    const WindowImageDrawing scaled = Now(Rect(0, 0, 50, 30));
    EXPECT_EQ(scaled.PartFor(changes), PixelRegion({0, 35, 50, 40}));
    EXPECT_EQ(scaled.PartFor(PixelRegion()), PixelRegion());
    EXPECT_EQ(scaled.PartFor(PixelRegion({70, 35, 80, 40})), PixelRegion({0, 35, 80, 40})) << "beside them";
}

TEST_F(WindowImageDrawings, AreDrawnInFewBandsWhereAnythingIsScaled) {
    const WindowImageDrawing scaled = Now(Rect(0, 0, 50, 30));
    PixelRegion changes;
    for (int i = 0; i < 8; ++i)
        changes.Add({i, 30 + 2 * i, i + 1, 31 + 2 * i});
    EXPECT_EQ(scaled.PartFor(changes)->Rects().size(), 8U);
    changes.Add({0, 50, 1, 51});
    EXPECT_EQ(scaled.PartFor(changes), PixelRegion({0, 30, 50, 51}));
}

TEST_F(WindowImageDrawings, AreDrawnAsAWholeWhereWhatIsScaledHasToBeTurnedIntoOtherPixelsFirst) {
    server = Scene()
                 .Display(0, 0, 100, 60)
                 .Window(1)
                 .At(0, 0, 100, 60)
                 .Format(PixelFormat::X2R10G10B10)
                 .Window(2)
                 .At(30, 20, 40, 32)
                 .Serve();
    ReplaceWindowServer(server);
    const PixelRegion top({0, 30, 50, 31});
    EXPECT_EQ(Now(Rect(0, 0, 50, 30)).PartFor(top), std::nullopt);
    EXPECT_EQ(Now().PartFor(top), top);
}

TEST_F(WindowImageDrawings, CanNotBeToldWithoutSomethingToDrawOn) {
    image = Take();
    WindowImageDrawing drawing;
    EXPECT_FALSE(drawing.Describe(nullptr, Rect(0, 0, 100, 60), image.get()));
    EXPECT_FALSE(drawing.Describe(canvas.Get(), Rect(0, 0, 0, 60), image.get()));
    EXPECT_FALSE(drawing.Describe(canvas.Get(), Rect(0, 0, 100, 60), nullptr));
    EXPECT_EQ(drawing, WindowImageDrawing());
}

// ---- Clips

TEST_F(WindowImageDrawings, KeepToTheClipInForceAndLeaveItAsItWas) {
    image = Take();
    const PixelBox clip{28, 18, 34, 24};
    CGContextSetClip(canvas.Get(), clip);
    EXPECT_TRUE(CGContextDrawWindowImage(canvas.Get(), Rect(0, 0, 100, 60), image.get()));
    EXPECT_EQ(CGContextGetClip(canvas.Get()), clip);
    for (int y = 0; y < 60; ++y) {
        for (int x = 0; x < 100; ++x) {
            const bool isIn = x >= 28 && x < 34 && y >= 18 && y < 24;
            const bool isFront = x >= 30 && y >= 20;
            const Colour inside = isFront ? Colour{0, 255, 0, 255} : Colour{255, 0, 0, 255};
            ASSERT_EQ(canvas.At(x, y), (isIn ? inside : Colour{0, 0, 0, 0})) << x << "," << y;
        }
    }
}

TEST_F(WindowImageDrawings, CoverAClipWhenOneOpaqueWindowDoes) {
    image = Take();
    const CGRect whole = Rect(0, 0, 100, 60);
    EXPECT_TRUE(CGContextIsCovered(canvas.Get(), whole, image.get()));
    EXPECT_FALSE(CGContextIsCovered(canvas.Get(), Rect(0, 0, 99, 60), image.get()));
    CGContextSetClip(canvas.Get(), {0, 0, 99, 60});
    EXPECT_TRUE(CGContextIsCovered(canvas.Get(), Rect(0, 0, 99, 60), image.get()));
    EXPECT_FALSE(CGContextIsCovered(canvas.Get(), whole, nullptr));
    EXPECT_FALSE(CGContextIsCovered(nullptr, whole, image.get()));
    server->SetAlpha(1, 0.9F);
    image = Take();
    EXPECT_FALSE(CGContextIsCovered(canvas.Get(), whole, image.get()));
}

TEST(ContextClip, IsHeldWithinTheContext) {
    Canvas canvas(10, 10, kCGImageAlphaNoneSkipLast);
    CGContextSetClip(canvas.Get(), {-5, 2, 100, 4});
    EXPECT_EQ(CGContextGetClip(canvas.Get()), (PixelBox{0, 2, 10, 4}));
    EXPECT_EQ(CGContextGetClip(nullptr), PixelBox{});
    CGContextSetClip(nullptr, {0, 0, 1, 1});
    EXPECT_EQ(CGContextBoxOf(canvas.Get(), Rect(1, 1, 2, 3)), (PixelBox{1, 6, 3, 9}));
    EXPECT_EQ(CGContextBoxOf(canvas.Get(), Rect(-3, -3, 20, 20)), (PixelBox{-3, -7, 17, 13}));
    EXPECT_EQ(CGContextBoxOf(nullptr, Rect(1, 1, 2, 3)), PixelBox{});
}
