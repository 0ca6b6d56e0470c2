// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/display_streams.h"
#include "platform/x11/x11_failure.h"
#include "tests/platform/conformance_checks.h"
#include "tests/support/threads.h"
#include "tests/x11/display_streams_bench.h"

#include <gtest/gtest.h>

#include <chrono>
#include <cstdint>
#include <memory>
#include <vector>

namespace platform::x11 {
namespace {

TEST(DisplayStreams, BeginsWithAllOfTheScreen) {
    if (LacksServer())
        GTEST_SKIP();
    StreamBench bench(SmallServer(XServerOptions::Kind::Xvfb));
    bench.Fill(0x204060, {10, 10, 50, 40});
    const StreamReaderPtr reader = bench.Open();
    const DisplayPictureResult first = bench.Take(reader);
    ASSERT_EQ(first.outcome, PictureOutcome::Ok);
    EXPECT_TRUE(IsLawful(*first.picture));
    EXPECT_EQ(first.picture->changed, (std::vector<PixelRect>{{0, 0, 320, 240}}));
    EXPECT_EQ(PixelsOf(*first.picture), bench.Screen());
    EXPECT_EQ(ArgbAt(*first.picture, 20, 20), 0xFF204060);
}

TEST(DisplayStreams, GivesNothingUntilSomethingIsPainted) {
    if (LacksServer())
        GTEST_SKIP();
    StreamBench bench(SmallServer(XServerOptions::Kind::Xvfb));
    const StreamReaderPtr reader = bench.Open();
    ASSERT_EQ(bench.Take(reader).outcome, PictureOutcome::Ok);
    EXPECT_EQ(bench.Take(reader).outcome, PictureOutcome::Nothing);
    EXPECT_EQ(bench.Take(reader).outcome, PictureOutcome::Nothing);
    bench.Fill(0xFF0000, {100, 50, 7, 5});
    const DisplayPictureResult next = bench.Take(reader);
    ASSERT_EQ(next.outcome, PictureOutcome::Ok);
    EXPECT_EQ(RegionOf(next.picture->changed).Bounds(), (PixelRect{100, 50, 107, 55}));
    EXPECT_EQ(bench.Take(reader).outcome, PictureOutcome::Nothing);
}

TEST(DisplayStreams, TellsEachReaderItsOwnChanges) {
    if (LacksServer())
        GTEST_SKIP();
    StreamBench bench(SmallServer(XServerOptions::Kind::Xvfb));
    const StreamReaderPtr often = bench.Open();
    const StreamReaderPtr seldom = bench.Open();
    ASSERT_EQ(bench.Take(often).outcome, PictureOutcome::Ok);
    ASSERT_EQ(bench.Take(seldom).outcome, PictureOutcome::Ok);
    bench.Fill(0xFF0000, {10, 10, 5, 5});
    ASSERT_EQ(bench.Take(often).outcome, PictureOutcome::Ok);
    bench.Fill(0x00FF00, {200, 200, 5, 5});
    const DisplayPictureResult one = bench.Take(often);
    const DisplayPictureResult other = bench.Take(seldom);
    ASSERT_EQ(one.outcome, PictureOutcome::Ok);
    ASSERT_EQ(other.outcome, PictureOutcome::Ok);
    EXPECT_FALSE(RegionOf(one.picture->changed).Contains(12, 12));
    EXPECT_TRUE(RegionOf(other.picture->changed).Contains(12, 12));
    EXPECT_TRUE(RegionOf(other.picture->changed).Contains(202, 202));
    EXPECT_EQ(one.picture->pixels, other.picture->pixels) << "fetched twice";
    EXPECT_EQ(bench.Take(seldom).outcome, PictureOutcome::Nothing);
}

TEST(DisplayStreams, KeepToTheirRate) {
    if (LacksServer())
        GTEST_SKIP();
    StreamBench bench(SmallServer(XServerOptions::Kind::Xvfb));
    CManualClockScope clock;
    const StreamReaderPtr reader = bench.Open(false, 10);
    ASSERT_EQ(bench.Take(reader).outcome, PictureOutcome::Ok);
    bench.Fill(0xFF0000, {0, 0, 5, 5});
    clock->Advance(std::chrono::milliseconds(99));
    EXPECT_EQ(bench.Take(reader).outcome, PictureOutcome::Nothing);
    EXPECT_TRUE(bench.TellWhatIsDue().empty());
    EXPECT_EQ(bench.streams.NextDue(), CmSteadyNow() + std::chrono::milliseconds(1));
    clock->Advance(std::chrono::milliseconds(1));
    EXPECT_EQ(bench.TellWhatIsDue(), std::vector<std::uint64_t>{reader->id});
    EXPECT_EQ(bench.Take(reader).outcome, PictureOutcome::Ok);
}

TEST(DisplayStreams, TellOfSomethingNewOnce) {
    if (LacksServer())
        GTEST_SKIP();
    StreamBench bench(SmallServer(XServerOptions::Kind::Xvfb));
    CManualClockScope clock;
    const StreamReaderPtr reader = bench.Open(false, 10);
    EXPECT_EQ(bench.TellWhatIsDue(), std::vector<std::uint64_t>{reader->id}) << "of the first picture";
    EXPECT_TRUE(bench.TellWhatIsDue().empty());
    ASSERT_EQ(bench.Take(reader).outcome, PictureOutcome::Ok);
    clock->Advance(std::chrono::seconds(1));
    EXPECT_TRUE(bench.TellWhatIsDue().empty()) << "of nothing new";
    bench.Fill(0xFF0000, {0, 0, 5, 5});
    EXPECT_EQ(bench.TellWhatIsDue(), std::vector<std::uint64_t>{reader->id});
    bench.Fill(0x00FF00, {0, 0, 5, 5});
    clock->Advance(std::chrono::seconds(1));
    EXPECT_TRUE(bench.TellWhatIsDue().empty()) << "again, before the picture was taken";
    EXPECT_FALSE(bench.streams.NextDue());
    ASSERT_EQ(bench.Take(reader).outcome, PictureOutcome::Ok);
    clock->Advance(std::chrono::seconds(1));
    EXPECT_TRUE(bench.TellWhatIsDue().empty());
}

TEST(DisplayStreams, DrawThePointerForThoseWhoWantIt) {
    if (LacksServer())
        GTEST_SKIP();
    StreamBench bench(SmallServer(XServerOptions::Kind::Xvfb));
    bench.Fill(0x8090A0, {0, 0, 320, 240});
    bench.MovePointer(50, 60);
    const StreamReaderPtr with = bench.Open(true);
    const StreamReaderPtr without = bench.Open();
    const DisplayPictureResult plain = bench.Take(without);
    ASSERT_EQ(plain.outcome, PictureOutcome::Ok);
    EXPECT_TRUE(Shows(*plain.picture, 0x8090A0));
    const DisplayPictureResult first = bench.Take(with);
    ASSERT_EQ(first.outcome, PictureOutcome::Ok);
    EXPECT_FALSE(Shows(*first.picture, 0x8090A0)) << "there is no pointer";
    EXPECT_TRUE(Shows(*plain.picture, 0x8090A0)) << "it was drawn into the other one's";

    bench.MovePointer(200, 100);
    EXPECT_EQ(bench.Take(without).outcome, PictureOutcome::Nothing);
    const DisplayPictureResult next = bench.Take(with);
    ASSERT_EQ(next.outcome, PictureOutcome::Ok);
    EXPECT_TRUE(RegionOf(next.picture->changed).Contains(50, 60));
    EXPECT_TRUE(RegionOf(next.picture->changed).Contains(200, 100));
    EXPECT_FALSE(RegionOf(next.picture->changed).Contains(120, 200));
    StreamCopy copy;
    Picture whole = *first.picture;
    ASSERT_TRUE(copy.Take(whole));
    EXPECT_TRUE(copy.Take(*next.picture));
    EXPECT_EQ(bench.Take(with).outcome, PictureOutcome::Nothing);
}

TEST(DisplayStreams, TellThatThePointerHasMoved) {
    if (LacksServer())
        GTEST_SKIP();
    StreamBench bench(SmallServer(XServerOptions::Kind::Xvfb));
    CManualClockScope clock;
    const StreamReaderPtr with = bench.Open(true, 10);
    const StreamReaderPtr without = bench.Open(false, 10);
    ASSERT_EQ(bench.Take(with).outcome, PictureOutcome::Ok);
    ASSERT_EQ(bench.Take(without).outcome, PictureOutcome::Ok);
    clock->Advance(std::chrono::seconds(1));
    EXPECT_TRUE(bench.TellWhatIsDue().empty());
    bench.MovePointer(100, 100);
    EXPECT_TRUE(bench.TellWhatIsDue().empty()) << "looked twice in one period";
    clock->Advance(std::chrono::milliseconds(100));
    EXPECT_EQ(bench.TellWhatIsDue(), std::vector<std::uint64_t>{with->id});
    EXPECT_EQ(bench.Take(with).outcome, PictureOutcome::Ok);
}

TEST(DisplayStreams, AreGoneWithTheirDisplayAndBeginAnewWithANewLayout) {
    if (LacksServer())
        GTEST_SKIP();
    StreamBench bench(SmallServer(XServerOptions::Kind::Xvfb));
    const StreamReaderPtr reader = bench.Open();
    const PicturePtr first = bench.Take(reader).picture;
    ASSERT_NE(first, nullptr);
    const std::vector<std::uint32_t> pixels = PixelsOf(*first);

    DisplayList moved = *bench.mirror.Displays();
    moved[0].bounds = {{100, 20}, {120, 90}};
    bench.streams.OnDisplaysChanged(moved);
    StreamMoment moment;
    moment.displays = &moved;
    moment.generationAfter = [] { return std::uint64_t{0}; };
    const DisplayPictureResult next = bench.streams.Take(*reader, moment);
    ASSERT_EQ(next.outcome, PictureOutcome::Ok);
    EXPECT_EQ(next.picture->rect, moved[0].bounds);
    EXPECT_EQ(next.picture->changed, (std::vector<PixelRect>{{0, 0, 120, 90}}));

    const DisplayList none;
    bench.streams.OnDisplaysChanged(none);
    EXPECT_EQ(bench.Take(reader).outcome, PictureOutcome::Gone);
    EXPECT_FALSE(bench.streams.NextDue());
    EXPECT_EQ(PixelsOf(*first), pixels);
}

TEST(DisplayStreams, CutWhatReachesBeyondTheRoot) {
    if (LacksServer())
        GTEST_SKIP();
    StreamBench bench(SmallServer(XServerOptions::Kind::Xvfb));
    const StreamReaderPtr reader = bench.Open();
    DisplayList large = *bench.mirror.Displays();
    large[0].bounds = {{300, 200}, {4000, 4000}};
    StreamMoment moment;
    moment.displays = &large;
    moment.generationAfter = [] { return std::uint64_t{0}; };
    const DisplayPictureResult result = bench.streams.Take(*reader, moment);
    ASSERT_EQ(result.outcome, PictureOutcome::Ok);
    EXPECT_EQ(result.picture->width, 20);
    EXPECT_EQ(result.picture->height, 40);
    EXPECT_TRUE(IsLawful(*result.picture));
    large[0].bounds = {{3000, 0}, {10, 10}};
    EXPECT_EQ(bench.streams.Take(*reader, moment).outcome, PictureOutcome::Nothing);
}

TEST(DisplayStreams, SayWhichStackAPictureShows) {
    if (LacksServer())
        GTEST_SKIP();
    StreamBench bench(SmallServer(XServerOptions::Kind::Xvfb));
    const StreamReaderPtr one = bench.Open();
    const StreamReaderPtr other = bench.Open();
    bench.memory.generation = 7;
    const PicturePtr first = bench.Take(one).picture;
    ASSERT_NE(first, nullptr);
    EXPECT_EQ(first->generationBefore, 7U);
    EXPECT_EQ(first->generationAfter, 7U);
    EXPECT_EQ(bench.asksForGeneration, 1);
    bench.memory.generation = 9;
    const PicturePtr later = bench.Take(other).picture;
    ASSERT_NE(later, nullptr);
    EXPECT_EQ(later->pixels, first->pixels);
    EXPECT_EQ(later->generationBefore, 9U) << "nothing was painted, so it shows the new stack as well";
    EXPECT_EQ(later->generationAfter, 9U);
    EXPECT_EQ(first->generationAfter, 7U);
}

TEST(DisplayStreams, TellOfAnotherStackUnderAPictureThatStandsStill) {
    if (LacksServer())
        GTEST_SKIP();
    StreamBench bench(SmallServer(XServerOptions::Kind::Xvfb));
    for (const bool withPointer : {false, true}) {
        const StreamReaderPtr reader = bench.Open(withPointer);
        bench.memory.generation = 7;
        const PicturePtr first = bench.Take(reader).picture;
        ASSERT_NE(first, nullptr);
        bench.memory.generation = 9;
        EXPECT_TRUE(bench.TellWhatIsDue().empty());
        const PicturePtr later = bench.Take(reader).picture;
        ASSERT_NE(later, nullptr);
        EXPECT_TRUE(IsLawful(*later));
        EXPECT_TRUE(later->changed.empty());
        EXPECT_EQ(later->pixels, first->pixels);
        EXPECT_EQ(later->generationBefore, 9U);
        EXPECT_EQ(later->generationAfter, 9U);
        EXPECT_EQ(first->generationAfter, 7U) << "a picture that was given out has changed";
        EXPECT_EQ(bench.Take(reader).outcome, PictureOutcome::Nothing);
        bench.streams.Detach(reader);
    }
}

TEST(DisplayStreams, SayWhenNothingOlderIsSeenAnyLonger) {
    if (LacksServer())
        GTEST_SKIP();
    StreamBench bench(SmallServer(XServerOptions::Kind::Xvfb));
    const StreamReaderPtr reader = bench.Open();
    bench.memory.generation = 9;
    bench.oldest = 7;
    const PicturePtr early = bench.Take(reader).picture;
    ASSERT_NE(early, nullptr);
    EXPECT_EQ(early->generationBefore, 7U);
    EXPECT_EQ(bench.Take(reader).outcome, PictureOutcome::Nothing);
    bench.oldest.reset();
    const PicturePtr settled = bench.Take(reader).picture;
    ASSERT_NE(settled, nullptr);
    EXPECT_TRUE(settled->changed.empty());
    EXPECT_EQ(settled->generationBefore, 9U);
    EXPECT_EQ(settled->generationAfter, 9U);
    EXPECT_EQ(bench.Take(reader).outcome, PictureOutcome::Nothing);
    bench.oldest = 0;
    const PicturePtr untold = bench.Take(reader).picture;
    ASSERT_NE(untold, nullptr);
    EXPECT_EQ(untold->generationBefore, 0U);
    EXPECT_EQ(bench.Take(reader).outcome, PictureOutcome::Nothing);
}

TEST(DisplayStreams, NeverTakeAnOldPictureForOneOfTheNewStack) {
    if (LacksServer())
        GTEST_SKIP();
    StreamBench bench(SmallServer(XServerOptions::Kind::Xvfb));
    const StreamReaderPtr reader = bench.Open();
    bench.memory.generation = 7;
    const PicturePtr first = bench.Take(reader).picture;
    ASSERT_NE(first, nullptr);
    bench.CatchUp();
    bench.Fill(0xFF0000, {100, 50, 7, 5});
    bench.link.RoundTrip();
    bench.memory.generation = 9; // heard of already, and of the painting nobody has heard
    const PicturePtr next = bench.TakeAsOfNow(reader).picture;
    ASSERT_NE(next, nullptr);
    EXPECT_EQ(next->generationBefore, 9U);
    EXPECT_TRUE(RegionOf(next->changed).Contains(102, 52));
    EXPECT_EQ(ArgbAt(*next, 102, 52), 0xFFFF0000);
}

TEST(DisplayStreams, AskTheServerNothingWhileNothingHappens) {
    if (LacksServer())
        GTEST_SKIP();
    StreamBench bench(SmallServer(XServerOptions::Kind::Xvfb));
    const StreamReaderPtr reader = bench.Open();
    bench.memory.generation = 7;
    ASSERT_EQ(bench.Take(reader).outcome, PictureOutcome::Ok);
    ASSERT_EQ(bench.Take(reader).outcome, PictureOutcome::Nothing);
    bench.server.Stop();
    bench.connection.SetDeadline(CmSteadyNow() + std::chrono::milliseconds(50));
    DisplayPictureResult idle;
    EXPECT_NO_THROW(idle = bench.TakeAsOfNow(reader));
    EXPECT_EQ(idle.outcome, PictureOutcome::Nothing);
    bench.memory.generation = 8;
    EXPECT_THROW(bench.TakeAsOfNow(reader), Unanswered) << "it can't know that nothing was painted";
    bench.server.Continue();
    bench.connection.SetDeadline(CmSteadyNow() + PATIENCE);
    const PicturePtr next = bench.Take(reader).picture;
    ASSERT_NE(next, nullptr);
    EXPECT_EQ(next->generationBefore, 8U);
}

TEST(DisplayStreams, DrawATranslucentPointerOnceHoweverOftenSomethingChangesElsewhere) {
    if (LacksServer())
        GTEST_SKIP();
    StreamBench bench(SmallServer(XServerOptions::Kind::Xvfb));
    bench.Fill(0x000000, {0, 0, 320, 240});
    const auto bytes = std::make_shared<std::vector<std::uint8_t>>(4 * 4 * 4, std::uint8_t{0x80});
    Picture image;
    image.width = 4;
    image.height = 4;
    image.stride = 16;
    image.format = PixelFormat::BGRA;
    image.pixels = bytes->data();
    image.memory = bytes;
    auto cursor = std::make_shared<CursorImage>();
    cursor->representations.push_back(std::make_shared<const Picture>(image));
    bench.cursor = cursor;
    bench.MovePointer(50, 60);
    const StreamReaderPtr reader = bench.Open(true);
    const auto pixel = [](const PicturePtr& picture) {
        return picture != nullptr ? ArgbAt(*picture, 51, 61) : 0U;
    };
    const std::uint32_t once = pixel(bench.Take(reader).picture);
    EXPECT_EQ(once, 0xFF808080);
    for (std::int16_t x = 100; x < 103; ++x) {
        bench.Fill(0xFF0000, {x, 200, 5, 5});
        EXPECT_EQ(pixel(bench.Take(reader).picture), once);
    }
}

TEST(DisplayStreams, UnpackPixelsOfTwoBytes) {
    if (LacksServer())
        GTEST_SKIP();
    StreamBench bench(SmallServer(XServerOptions::Kind::Xvfb, 16));
    bench.Fill(0xF800, {0, 0, 320, 240});
    const StreamReaderPtr reader = bench.Open();
    const DisplayPictureResult first = bench.Take(reader);
    ASSERT_EQ(first.outcome, PictureOutcome::Ok);
    EXPECT_TRUE(Shows(*first.picture, 0xFF0000));
    bench.Fill(0x07E0, {0, 100, 320, 3});
    const DisplayPictureResult next = bench.Take(reader);
    ASSERT_EQ(next.outcome, PictureOutcome::Ok);
    EXPECT_EQ(ArgbAt(*next.picture, 319, 101), 0xFF00FF00);
    EXPECT_EQ(ArgbAt(*next.picture, 319, 103), 0xFFFF0000);
}

TEST(DisplayStreams, DrawThePointerOverDeepColours) {
    if (LacksServer())
        GTEST_SKIP();
    StreamBench bench(SmallServer(XServerOptions::Kind::Xvfb, 30));
    bench.Fill(0x3FF00000, {0, 0, 320, 240});
    bench.MovePointer(100, 100);
    const StreamReaderPtr with = bench.Open(true);
    const DisplayPictureResult first = bench.Take(with);
    ASSERT_EQ(first.outcome, PictureOutcome::Ok);
    EXPECT_EQ(first.picture->format, PixelFormat::X2R10G10B10);
    EXPECT_EQ(ArgbAt(*first.picture, 10, 10), 0xFFFF0000);
    EXPECT_FALSE(Shows(*first.picture, 0xFF0000)) << "there is no pointer";
    EXPECT_EQ(bench.Take(with).outcome, PictureOutcome::Nothing);
}

TEST(DisplayStreams, OutliveTheirConnection) {
    if (LacksServer())
        GTEST_SKIP();
    StreamReaderPtr reader;
    PicturePtr first;
    std::vector<std::uint32_t> pixels;
    {
        StreamBench bench(SmallServer(XServerOptions::Kind::Xvfb));
        reader = bench.Open();
        first = bench.Take(reader).picture;
        ASSERT_NE(first, nullptr);
        pixels = PixelsOf(*first);
        bench.server.Kill();
    }
    EXPECT_EQ(reader->place, nullptr);
    EXPECT_EQ(PixelsOf(*first), pixels);
}

} // namespace
} // namespace platform::x11
