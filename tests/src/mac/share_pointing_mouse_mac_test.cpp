// SPDX-License-Identifier: Apache-2.0
#include "src/app_share_config.h"
#include "tests/src/mac/share_pointing_mouse_mac_tools.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <cstdint>
#include <memory>
#include <new>
#include <optional>
#include <string>
#include <vector>

// The pointer of a desktop, polled.

namespace {

using Bytes = std::vector<std::uint8_t>;
using Lines = std::vector<std::string>;

const std::string NAME = "CSharePointingMouseMac::";
const std::string LOOKED_UP = Debug(NAME + "InitPointingContext()");
const std::string CALLED = Debug(NAME + "CapturePoint() call sink's OnPointingImgChanged()");
const std::string NOBODY = Debug(NAME + "CapturePoint() cursor changed but no sink to notify");

Bytes Pixels(std::size_t count, const Bytes& pixel) {
    Bytes bytes;
    for (std::size_t i = 0; i < count; ++i)
        bytes.insert(bytes.end(), pixel.begin(), pixel.end());
    return bytes;
}

// ---- Life

TEST_F(SharePointingMouseMac, AnswersZeroToAllButThePollOfTheCapturePass) {
    CSharePointingMouseMac mouse(MAIN);
    mouse.AddSink(&sink);
    EXPECT_EQ(mouse.Start(), 0);
    EXPECT_EQ(mouse.Stop(), 0);
    EXPECT_EQ(mouse.SetBaseDisplayID(NO_DISPLAY), 0);
    EXPECT_EQ(mouse.CapturePoint(SHARE_FRAME_FORMAT_RGBA, 1.0F), -3);
    EXPECT_TRUE(sink.images.empty() && sink.positions.empty());
    EXPECT_EQ(mouse.CapturePoint(SHARE_FRAME_FORMAT_RGBA), 0);
}

TEST_F(SharePointingMouseMac, TracesEachLookUpOfTheBounds) {
    const CTraceLog trace;
    CSharePointingMouseMac mouse(SIDE);
    EXPECT_TRUE(trace.Lines().empty());
    mouse.Start();
    mouse.SetBaseDisplayID(MAIN);
    mouse.OnDisplayChanged();
    mouse.Stop();
    EXPECT_EQ(trace.Lines(), Lines(3, LOOKED_UP));
}

TEST_F(SharePointingMouseMac, KnowsNoBoundsBeforeItIsStartedOrTold) {
    CSharePointingMouseMac mouse(MAIN);
    mouse.AddSink(&sink);
    EXPECT_EQ(PositionsAt(mouse, 100, 50), Lines());
    mouse.Start();
    EXPECT_EQ(PositionsAt(mouse, 101, 50), Lines{"101,50"});
}

// ---- The first poll

TEST_F(SharePointingMouseMac, TellsTheImageAndThenThePositionAtTheFirstPoll) {
    CSharePointingMouseMac mouse(MAIN);
    mouse.AddSink(&sink);
    mouse.Start();
    const CTraceLog trace;
    EXPECT_EQ(mouse.CapturePoint(SHARE_FRAME_FORMAT_RGBA), 0);
    EXPECT_EQ(sink.positions, Lines{"100,50"});
    ASSERT_EQ(sink.images.size(), 1u);
    EXPECT_EQ(trace.Lines(),
              (Lines{CALLED, Detail(NAME + "CapturePoint() m_rcScreenBounds=0 y=0 w=1920 h=1080"),
                     Detail(NAME + "CapturePoint() origin gc_position=100 y=50"),
                     Debug(NAME + "CapturePoint() Converted gc_position=100 y=50"),
                     Detail(NAME + "CapturePoint() Scaled gc_position=100 y=50 scale=1")}));
}

TEST_F(SharePointingMouseMac, TracesThatNobodyHearsOfTheImageAndDoesNotTellItLater) {
    CSharePointingMouseMac mouse(NO_DISPLAY);
    const CTraceLog trace(CM_TRACE_DEBUG);
    mouse.CapturePoint(SHARE_FRAME_FORMAT_RGBA);
    EXPECT_EQ(trace.Lines(), Lines{NOBODY});
    mouse.AddSink(&sink);
    mouse.CapturePoint(SHARE_FRAME_FORMAT_RGBA);
    EXPECT_TRUE(sink.images.empty());
}

TEST_F(SharePointingMouseMac, TellsTheImageButNoPositionWithoutABaseDisplay) {
    CSharePointingMouseMac mouse(NO_DISPLAY);
    mouse.AddSink(&sink);
    mouse.Start();
    mouse.CapturePoint(SHARE_FRAME_FORMAT_RGBA);
    EXPECT_EQ(sink.images.size(), 1u);
    EXPECT_EQ(sink.positions, Lines());
}

TEST_F(SharePointingMouseMac, TellsEverySinkInTheOrderOfAdding) {
    CPointerSink other;
    CSharePointingMouseMac mouse(MAIN);
    mouse.AddSink(&sink);
    mouse.AddSink(&other);
    mouse.Start();
    mouse.CapturePoint(SHARE_FRAME_FORMAT_RGBA);
    EXPECT_EQ(other.positions, sink.positions);
    ASSERT_EQ(other.images.size(), 1u);
    EXPECT_EQ(other.last.Get(), sink.last.Get());
    mouse.RemoveSink(&sink);
    Forget();
    EXPECT_EQ(PositionsAt(mouse, 7, 8), Lines());
    EXPECT_EQ(other.positions.back(), "7,8");
}

// ---- Positions

TEST_F(SharePointingMouseMac, AddsSlowDriftUpUntilItIsHalfAPoint) {
    const auto mouse = Polled(MAIN);
    const CTraceLog trace;
    EXPECT_EQ(PositionsAt(*mouse, 100.4F, 50.4F), Lines());
    EXPECT_TRUE(trace.Lines().empty());
    EXPECT_EQ(PositionsAt(*mouse, 100.8F, 50.8F), Lines{"100,50"});
}

TEST_F(SharePointingMouseMac, CallsHalfAPointOnOneAxisAMove) {
    const auto mouse = Polled(MAIN);
    EXPECT_EQ(PositionsAt(*mouse, 100.5F, 50), Lines{"100,50"});
    EXPECT_EQ(PositionsAt(*mouse, 100, 50), Lines{"100,50"});
    EXPECT_EQ(PositionsAt(*mouse, 100, 50.5F), Lines{"100,50"});
    EXPECT_EQ(PositionsAt(*mouse, 100, 50), Lines{"100,50"});
    EXPECT_EQ(PositionsAt(*mouse, 100.49F, 49.51F), Lines());
    EXPECT_EQ(PositionsAt(*mouse, 99.51F, 50.49F), Lines());
}

TEST_F(SharePointingMouseMac, TellsScaledPixelsFromTheTopLeftOfTheBaseDisplay) {
    const auto mouse = Polled(SIDE);
    AppShareConfig::Instance()->SetCurrentScale(0.5F);
    const CTraceLog trace;
    EXPECT_EQ(PositionsAt(*mouse, 2000, 100), Lines{"40,50"});
    EXPECT_EQ(trace.Lines(), (Lines{Detail(NAME + "CapturePoint() m_rcScreenBounds=1920 y=0 w=1280 h=800"),
                                    Detail(NAME + "CapturePoint() origin gc_position=2000 y=100"),
                                    Debug(NAME + "CapturePoint() Converted gc_position=80 y=100"),
                                    Detail(NAME + "CapturePoint() Scaled gc_position=40 y=50 scale=0.5")}));
}

TEST_F(SharePointingMouseMac, CutsScaledPixels) {
    const auto mouse = Polled(MAIN);
    AppShareConfig::Instance()->SetCurrentScale(1.5F);
    EXPECT_EQ(PositionsAt(*mouse, 3, 5), (Lines{"4,7"}));
}

TEST_F(SharePointingMouseMac, TakesATenthForASmallerScale) {
    const auto mouse = Polled(MAIN);
    AppShareConfig::Instance()->m_fCurrentScale = 0.05F;
    EXPECT_EQ(PositionsAt(*mouse, 200, 100), Lines{"20,10"});
}

TEST_F(SharePointingMouseMac, TellsNoPositionElsewhereButEveryCursor) {
    const auto mouse = Polled(MAIN);
    server->SetCursor(Cursor(8, 0xFF00FF));
    EXPECT_EQ(PositionsAt(*mouse, 2000, 100), Lines());
    EXPECT_EQ(sink.images.size(), 1u);
    EXPECT_EQ(PositionsAt(*mouse, 1920, 0), Lines()) << "the right edge is outside";
    EXPECT_EQ(PositionsAt(*mouse, 1919, 1079), Lines{"1919,1079"});
    EXPECT_EQ(PositionsAt(*mouse, 1919, 1080), Lines()) << "the bottom edge is outside";
}

TEST_F(SharePointingMouseMac, KeepsAPlaceOutsideInMindUntilThePointerMoves) {
    const auto mouse = Polled(MAIN);
    EXPECT_EQ(PositionsAt(*mouse, 2000, 100), Lines());
    mouse->SetBaseDisplayID(SIDE);
    EXPECT_EQ(PositionsAt(*mouse, 2000.4F, 100), Lines());
    EXPECT_EQ(PositionsAt(*mouse, 2000.5F, 100), Lines{"80,100"});
}

TEST_F(SharePointingMouseMac, KeepsTheBoundsOfADisplayThatIsGoneOrUnknown) {
    const auto mouse = Polled(SIDE);
    mouse->SetBaseDisplayID(99);
    EXPECT_EQ(PositionsAt(*mouse, 1930, 20), Lines{"10,20"});
    mouse->SetBaseDisplayID(SIDE);
    server->RemoveDisplay(SIDE);
    ASSERT_TRUE(NoticesAreDelivered(*server));
    EXPECT_EQ(PositionsAt(*mouse, 1940, 20), Lines{"20,20"});
}

TEST_F(SharePointingMouseMac, TellsNoPositionWhileNobodyKnowsIt) {
    const auto mouse = Polled(MAIN);
    server->SetPointer(std::nullopt);
    EXPECT_EQ(mouse->CapturePoint(SHARE_FRAME_FORMAT_RGBA), 0);
    EXPECT_EQ(sink.positions, Lines());
    EXPECT_EQ(PositionsAt(*mouse, 100, 50), Lines{"100,50"});
}

// ---- Images

TEST_F(SharePointingMouseMac, HandsTheBytesOfTheSystemOnWhateverTheFormat) {
    const platform::SimulatedCursor cursor = Cursor(8, 0x102030);
    const Bytes pixels = Pixels(64, {0x10, 0x20, 0x30, 255});
    for (const SHARE_FRAME_FORMAT format : {SHARE_FRAME_FORMAT_RGBA, SHARE_FRAME_FORMAT_ARGB,
                                            SHARE_FRAME_FORMAT_BGRA, SHARE_FRAME_FORMAT_ABGR}) {
        const ImageTold image = FirstImage(cursor, format);
        EXPECT_EQ(image.hotX, 3);
        EXPECT_EQ(image.hotY, 5);
        EXPECT_EQ(image.size, (TVLSize{8, 8}));
        EXPECT_EQ(image.format, format);
        EXPECT_TRUE(image.isStamped);
        EXPECT_EQ(image.pixels, pixels) << format;
    }
}

TEST_F(SharePointingMouseMac, LeavesAFrameUnwrittenThatTheBytesDoNotFitIn) {
    const ImageTold image = FirstImage(Cursor(8, 0x102030), SHARE_FRAME_FORMAT_BGR);
    EXPECT_EQ(image.size, (TVLSize{8, 8}));
    EXPECT_EQ(image.pixels, Bytes(192, 0));
    EXPECT_TRUE(image.isStamped);
    EXPECT_EQ(FirstImage(Cursor(8, 0x102030), SHARE_FRAME_FORMAT_NONE).pixels, Bytes());
}

TEST_F(SharePointingMouseMac, TellsSizeAndHotPointOfABitmapFinerThanPoints) {
    const ImageTold image = FirstImage(Cursor(32, 0x102030, 2.0F));
    EXPECT_EQ(image.size, (TVLSize{16, 16}));
    EXPECT_EQ(image.hotX, 3);
    EXPECT_EQ(image.hotY, 5);
    EXPECT_EQ(image.pixels, Bytes(1024, 0));
    EXPECT_TRUE(image.isStamped);
}

TEST_F(SharePointingMouseMac, TakesOfSeveralResolutionsTheOneInPoints) {
    platform::SimulatedCursor cursor = Cursor(16, 0x445566, 2.0F);
    cursor.representations.push_back(Cursor(8, 0x112233).representations[0]);
    const ImageTold image = FirstImage(cursor);
    EXPECT_EQ(image.size, (TVLSize{8, 8}));
    EXPECT_EQ(image.pixels, Pixels(64, {0x11, 0x22, 0x33, 255}));
}

TEST_F(SharePointingMouseMac, CutsSizeAndHotPointToWholePoints) {
    const ImageTold image = FirstImage(PointingAt(Cursor(9, 0x102030, 2.0F), 1.9F, 2.2F));
    EXPECT_EQ(image.size, (TVLSize{4, 4}));
    EXPECT_EQ(image.hotX, 1);
    EXPECT_EQ(image.hotY, 2);
}

TEST_F(SharePointingMouseMac, TellsAnEmptyImageOnceWhenThereIsNoCursor) {
    const ImageTold image = FirstImage(std::nullopt);
    EXPECT_EQ(image.hotX, -4);
    EXPECT_EQ(image.hotY, -4);
    EXPECT_EQ(image.size, (TVLSize{0, 0}));
    EXPECT_EQ(image.format, SHARE_FRAME_FORMAT_RGBA);
    EXPECT_FALSE(image.isStamped);
    const auto mouse = Polled(MAIN);
    EXPECT_EQ(ImagesOf(*mouse, std::nullopt), 0u);
    EXPECT_EQ(ImagesOf(*mouse, Cursor(8, 0x102030)), 1u);
    EXPECT_EQ(ImagesOf(*mouse, std::nullopt), 1u);
}

TEST_F(SharePointingMouseMac, TellsAnotherImageOnlyWhenItLooksDifferent) {
    const auto mouse = Polled(MAIN);
    EXPECT_EQ(ImagesOf(*mouse, Cursor(8, 0x102030)), 0u) << "another cursor with the same bytes";
    EXPECT_EQ(ImagesOf(*mouse, Cursor(8, 0x102031)), 1u) << "of another colour";
    EXPECT_EQ(ImagesOf(*mouse, Cursor(8, 0x102031)), 0u);
    EXPECT_EQ(ImagesOf(*mouse, Cursor(9, 0x102031)), 1u) << "of another size";
    EXPECT_EQ(ImagesOf(*mouse, Cursor(18, 0x102031, 2.0F)), 1u) << "as large, and finer";
}

TEST_F(SharePointingMouseMac, TellsAnotherImageWhenTheHotPointMovesMoreThanAHair) {
    const auto mouse = Polled(MAIN);
    EXPECT_EQ(ImagesOf(*mouse, PointingAt(Cursor(8, 0x102030), 3.01F, 5.01F)), 0u);
    EXPECT_EQ(ImagesOf(*mouse, PointingAt(Cursor(8, 0x102030), 3.03F, 5)), 1u);
    EXPECT_EQ(ImagesOf(*mouse, PointingAt(Cursor(8, 0x102030), 3.03F, 4.97F)), 1u);
}

TEST_F(SharePointingMouseMac, HandsOutAnImageThatLastsAsLongAsItIsHeld) {
    auto mouse = Polled(MAIN);
    EXPECT_EQ(sink.last.Get()->GetReference(), 1u) << "the mouse keeps none itself";
    mouse.reset();
    EXPECT_EQ(sink.last.Get()->GetImgData()->GetFrameDataLen(), 256);
}

TEST_F(SharePointingMouseMac, FailsAPollInWhichASinkThrowsAndTellsTheImageAgain) {
    const auto mouse = Polled(MAIN);
    server->SetCursor(Cursor(8, 0xFF0000));
    sink.throws = true;
    const CTraceLog trace(CM_TRACE_ERROR);
    EXPECT_EQ(mouse->CapturePoint(SHARE_FRAME_FORMAT_RGBA), -1);
    ASSERT_EQ(trace.Lines().size(), 1u);
    EXPECT_TRUE(IsLineAt(trace.Lines()[0], Error(NAME + "CapturePoint() fail " + std::bad_alloc().what()),
                         "src/mac/share_pointing_mouse_mac"));
    sink.throws = false;
    EXPECT_EQ(mouse->CapturePoint(SHARE_FRAME_FORMAT_RGBA), 0);
    EXPECT_EQ(sink.images.size(), 1u);
}

// ---- The cursor of a moment

TEST_F(SharePointingMouseMac, TakesTheCursorOfTheMoment) {
    const CCursorImageMac before(0);
    const CCursorImageMac copy(before);
    server->SetCursor(PointingAt(Cursor(8, 0x102030), 7.9F, -1.9F));
    const CCursorImageMac after(1);
    EXPECT_EQ(before.GetHotPointX(), 3);
    EXPECT_EQ(before.GetHotPointY(), 5);
    EXPECT_EQ(after.GetHotPointX(), 7);
    EXPECT_EQ(after.GetHotPointY(), -1);
    EXPECT_TRUE(copy.IsSame(before));
    EXPECT_FALSE(after.IsSame(before));
    server->SetCursor(std::nullopt);
    const CCursorImageMac none(0);
    EXPECT_EQ(none.GetHotPointX(), -4);
    EXPECT_EQ(none.GetHotPointY(), -4);
    EXPECT_TRUE(none.IsSame(CCursorImageMac(0)));
    EXPECT_FALSE(none.IsSame(before));
    EXPECT_FALSE(before.IsSame(nullptr));
}

TEST_F(SharePointingMouseMac, ComparesTheHotPointsOfTheSameImageFirst) {
    const CCursorImageMac cursor(0);
    const auto with = [&](float x, float y) {
        const platform::NSCursor other(cursor.Cursor()->image(), {x, y});
        return cursor.IsSame(&other);
    };
    EXPECT_TRUE(with(3.01F, 4.99F));
    EXPECT_FALSE(with(3.03F, 5));
    EXPECT_FALSE(with(2.97F, 5));
    EXPECT_FALSE(with(3, 5.03F));
    EXPECT_FALSE(with(3, 4.97F));
}

} // namespace
