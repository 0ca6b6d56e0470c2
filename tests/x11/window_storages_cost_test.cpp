// SPDX-License-Identifier: Apache-2.0
#include "platform/picture_changes.h"
#include "tests/x11/storages_bench.h"

// What pictures of windows cost: what is fetched for them, whose memory they are in, and how long it is kept.

namespace {

using namespace platform;
using namespace platform::x11;
using namespace std::chrono_literals;

constexpr std::uint32_t GREEN = 0xFF00FF00;
constexpr std::uint32_t BLUE = 0xFF0000FF;
constexpr std::uint32_t RED = 0xFFFF0000;
constexpr PixelRect PLACE{40, 30, 240, 130};
constexpr int AREA = 200 * 100;

std::vector<std::uint8_t> BytesOf(const Picture& picture) {
    std::vector<std::uint8_t> bytes;
    for (int y = 0; y < picture.height; ++y) {
        const std::uint8_t* const row = picture.pixels + static_cast<std::size_t>(y) * picture.stride;
        bytes.insert(bytes.end(), row, row + static_cast<std::ptrdiff_t>(picture.width) * 4);
    }
    return bytes;
}

TEST(WindowStorages, FetchNothingForAWindowThatStandsStill) {
    StoragesBench bench;
    bench.Begin();
    const xcb_window_t window = bench.Show(PLACE);
    const PicturePtr first = bench.TakeOne(window);
    ASSERT_TRUE(IsAll(first, GREEN));
    bench.Settle();
    const auto before = bench.Storages().TrafficSoFar();
    for (int i = 0; i < 50; ++i)
        ASSERT_EQ(bench.TakeOne(window), first);
    EXPECT_EQ(bench.Storages().TrafficSoFar().fetches, before.fetches);
    EXPECT_EQ(bench.Storages().TrafficSoFar().bytes, before.bytes);
}

TEST(WindowStorages, GiveTheSamePictureOfAWindowThatWasMoved) {
    StoragesBench bench;
    bench.Begin();
    const xcb_window_t window = bench.Show(PLACE);
    const PicturePtr first = bench.TakeOne(window);
    ASSERT_TRUE(IsAll(first, GREEN));
    bench.Move(window, 100, 90);
    bench.Settle();
    const PictureLayer moved = bench.TakeLayer(window);
    EXPECT_EQ(moved.picture, first);
    EXPECT_EQ(moved.frame.origin, (CGPoint{100, 90}));
}

/// Where somebody writes: the second letter is asked for before it is known where it is.
class Letters {
public:
    Letters() {
        bench.Begin();
        window = bench.Show(PLACE);
        EXPECT_TRUE(IsAll(bench.TakeOne(window), GREEN));
        Write(0x0000FF, 20);
        EXPECT_EQ(CountOf(*bench.TakeOne(window), BLUE), 8 * 10);
    }

    void Write(std::uint32_t colour, int x) {
        bench.Fill(window, colour, {x, 30, x + 8, 40});
        bench.Settle();
    }
    void AskAhead() {
        bench.Storages().AskAhead();
        bench.Connection().RoundTrip();
    }

    StoragesBench bench;
    xcb_window_t window = 0;
};

TEST(WindowStorages, FetchWhatIsWrittenBesideTheLastLetterWithTheQuestionForDamage) {
    Letters letters;
    letters.Write(0xFF0000, 28);
    letters.AskAhead();
    const unsigned before = xcb_no_operation(letters.bench.Connection().Get()).sequence;
    const PicturePtr picture = letters.bench.TakeOne(letters.window);
    EXPECT_EQ(xcb_no_operation(letters.bench.Connection().Get()).sequence, before + 1) << "it asked again";
    EXPECT_EQ(CountOf(*picture, RED), 8 * 10);
    EXPECT_EQ(CountOf(*picture, BLUE), 8 * 10);
    EXPECT_EQ(CountOf(*picture, GREEN), AREA - 160);
}

TEST(WindowStorages, FetchAgainWhatIsPaintedAfterItWasAskedForAhead) {
    Letters letters;
    letters.Write(0x00FFFF, 28);
    letters.AskAhead();
    letters.Write(0xFF0000, 28);
    EXPECT_EQ(CountOf(*letters.bench.TakeOne(letters.window), RED), 8 * 10);
}

TEST(WindowStorages, FetchWhatIsWrittenElsewhereThanItWasAskedForAhead) {
    Letters letters;
    letters.Write(0xFF0000, 150);
    letters.AskAhead();
    const PicturePtr picture = letters.bench.TakeOne(letters.window);
    EXPECT_EQ(CountOf(*picture, RED), 8 * 10);
    // The window may be another one by then.
    letters.Write(0x00FFFF, 150);
    letters.AskAhead();
    letters.bench.Resize(letters.window, 60, 50);
    letters.bench.Settle();
    EXPECT_TRUE(letters.bench.ComesTrueMeanwhile([&] {
        letters.bench.Fill(letters.window, 0xFF0000, {0, 0, 60, 50});
        letters.bench.Settle();
        letters.bench.Storages().AskAhead();
        return IsAll(letters.bench.TakeOne(letters.window), RED);
    }));
}

TEST(WindowStorages, FetchTheRectanglesThatHaveChangedAndNoOthers) {
    StoragesBench bench;
    bench.Begin();
    const xcb_window_t window = bench.Show(PLACE);
    ASSERT_TRUE(IsAll(bench.TakeOne(window), GREEN));
    bench.Fill(window, 0x0000FF, {13, 17, 20, 21});
    bench.Settle();
    const auto before = bench.Storages().TrafficSoFar();
    const PicturePtr changed = bench.TakeOne(window);
    ASSERT_NE(changed, nullptr);
    EXPECT_EQ(bench.Storages().TrafficSoFar().bytes - before.bytes, 7U * 4 * 4);
    EXPECT_EQ(CountOf(*changed, BLUE), 7 * 4);
    EXPECT_EQ(PixelAt(*changed, 13, 17), BLUE);
    EXPECT_EQ(PixelAt(*changed, 19, 20), BLUE);
    EXPECT_EQ(CountOf(*changed, GREEN), AREA - 28);
}

TEST(WindowStorages, FetchRectanglesThatAreFarApartEachOnItsOwn) {
    StoragesBench bench;
    bench.Begin();
    const xcb_window_t window = bench.Show({0, 0, 1000, 600});
    const PicturePtr first = bench.TakeOne(window);
    ASSERT_TRUE(IsAll(first, GREEN));
    const std::vector<PixelRect> painted{{10, 10, 20, 20}, {900, 300, 950, 310}, {0, 590, 900, 600}};
    PixelRegion all;
    for (const PixelRect& rect : painted) {
        bench.Fill(window, 0x0000FF, rect);
        all.Add(rect);
    }
    bench.Settle();
    const auto before = bench.Storages().TrafficSoFar();
    const PicturePtr changed = bench.TakeOne(window);
    ASSERT_NE(changed, nullptr);
    EXPECT_EQ(CountOf(*changed, BLUE), 100 + 500 + 9000);
    EXPECT_EQ(CountOf(*first, BLUE), 0);
    EXPECT_EQ(ChangesSince(*changed, first->serial), all);
    // What is nearly as wide as the window is read as whole rows.
    EXPECT_EQ(bench.Storages().TrafficSoFar().bytes - before.bytes, (100U + 500 + 10000) * 4);
}

TEST(WindowStorages, LearnOfChangesWithAnAnswerThatTheyWaitForAnyway) {
    StoragesBench bench;
    bench.Begin();
    const xcb_window_t window = bench.Show(PLACE);
    ASSERT_TRUE(IsAll(bench.TakeOne(window), GREEN));
    for (const int row : {0, 20, 40}) {
        bench.Fill(window, 0x0000FF, {0, row, 10, row + 10});
        bench.Settle();
        bench.Storages().AskAhead();
        bench.Storages().AskAhead();
        bench.Fill(window, 0x0000FF, {0, row + 10, 10, row + 20}); // is told later
        bench.Settle();
        const PicturePtr picture = bench.TakeOne(window);
        ASSERT_NE(picture, nullptr);
        EXPECT_EQ(CountOf(*picture, BLUE), 10 * (row + 20));
    }
    // Nobody takes a picture of what was asked about.
    bench.Fill(window, 0x00FF00, {0, 0, 200, 100});
    bench.Settle();
    bench.Storages().AskAhead();
    bench.Settle();
    bench.Move(window, 90, 90);
    bench.Settle();
    bench.Storages().AskAhead();
    EXPECT_TRUE(IsAll(bench.TakeOne(window), GREEN));
}

TEST(WindowStorages, NumberPicturesAndTellHowTheyCameOutOfEarlierOnes) {
    StoragesBench bench;
    bench.Begin();
    const xcb_window_t window = bench.Show(PLACE);
    const auto numberAfter = [&](const PixelRect& rect) {
        bench.Fill(window, 0x0000FF, rect);
        bench.Settle();
        const PicturePtr picture = bench.TakeOne(window);
        return picture != nullptr ? picture->serial : 0;
    };
    const std::uint64_t first = numberAfter({0, 0, 1, 1});
    const std::uint64_t second = numberAfter({0, 10, 200, 20});
    EXPECT_GT(first, 0U);
    EXPECT_GT(second, first);
    const PicturePtr held = bench.TakeOne(window);
    EXPECT_EQ(held->serial, second);
    EXPECT_EQ(ChangesSince(*held, first), PixelRegion(PixelRect{0, 10, 200, 20}));
    const std::uint64_t third = numberAfter({0, 50, 200, 60});
    const PicturePtr last = bench.TakeOne(window);
    ASSERT_EQ(last->serial, third);
    PixelRegion both(PixelRect{0, 10, 200, 20});
    both.Add(PixelRect{0, 50, 200, 60});
    EXPECT_EQ(ChangesSince(*last, first), both);
    EXPECT_EQ(ChangesSince(*last, second), PixelRegion(PixelRect{0, 50, 200, 60}));
    bench.Resize(window, 210, 100);
    EXPECT_TRUE(bench.ComesTrueMeanwhile([&] {
        const PicturePtr other = bench.TakeOne(window);
        return other != nullptr && other->serial > third && !ChangesSince(*other, third);
    }));
}

TEST(WindowStorages, NeverWriteToAPictureThatSomebodyHolds) {
    StoragesBench bench;
    bench.Begin();
    const xcb_window_t window = bench.Show(PLACE);
    std::vector<PicturePtr> held;
    std::vector<std::vector<std::uint8_t>> looked;
    for (std::uint32_t i = 0; i < 20; ++i) {
        const int row = static_cast<int>(i) * 5;
        bench.Fill(window, i * 0x0305, {0, i % 3 == 0 ? 0 : row, 200, row + 3});
        bench.Settle();
        held.push_back(bench.TakeOne(window));
        ASSERT_NE(held.back(), nullptr);
        looked.push_back(BytesOf(*held.back()));
        if (i > 0) {
            ASSERT_NE(held[i - 1], held[i]);
        }
    }
    for (std::size_t i = 0; i < held.size(); ++i)
        EXPECT_EQ(BytesOf(*held[i]), looked[i]) << i;
}

TEST(WindowStorages, NeverWriteToMemoryThatOutlivesItsPicture) {
    StoragesBench bench;
    bench.Begin();
    const xcb_window_t window = bench.Show(PLACE);
    PicturePtr picture = bench.TakeOne(window);
    ASSERT_TRUE(IsAll(picture, GREEN));
    const std::shared_ptr<const void> memory = picture->memory;
    const Picture shown = *picture;
    picture.reset();
    for (const std::uint32_t pixel : {0x0000FFU, 0x00FFFFU}) {
        bench.Fill(window, pixel, {0, 0, 200, 100});
        bench.Settle();
        ASSERT_TRUE(IsAll(bench.TakeOne(window), 0xFF000000U | pixel));
        ASSERT_EQ(CountOf(shown, GREEN), AREA);
    }
}

TEST(WindowStorages, UseTheSameMemoryAgainWhenNobodyHoldsThePicture) {
    StoragesBench bench;
    bench.Begin();
    const xcb_window_t window = bench.Show(PLACE);
    const std::uint8_t* first = nullptr;
    for (std::uint32_t i = 0; i < 10; ++i) {
        bench.Fill(window, i, {0, 0, 200, 100});
        bench.Settle();
        const PicturePtr picture = bench.TakeOne(window);
        ASSERT_TRUE(IsAll(picture, 0xFF000000U | i));
        if (first == nullptr)
            first = picture->pixels;
        EXPECT_EQ(picture->pixels, first);
    }
}

TEST(WindowStorages, ForgetPicturesThatNobodyAsksForAnyMore) {
    CManualClockScope clock;
    StoragesBench bench;
    bench.Begin();
    const xcb_window_t window = bench.Show(PLACE);
    ASSERT_TRUE(IsAll(bench.TakeOne(window), GREEN));
    const auto fetches = [&bench] { return bench.Storages().TrafficSoFar().fetches; };
    clock->Advance(4s);
    bench.Storages().DoDue();
    ASSERT_TRUE(IsAll(bench.TakeOne(window), GREEN));
    EXPECT_EQ(fetches(), 1U);
    ASSERT_TRUE(bench.Storages().NextDue());
    EXPECT_LE(*bench.Storages().NextDue(), CmSteadyNow() + WindowStorages::CACHE_TIME);
    clock->Advance(5s);
    bench.Storages().DoDue();
    ASSERT_TRUE(IsAll(bench.TakeOne(window), GREEN));
    EXPECT_EQ(fetches(), 2U);
    for (int i = 0; i < 4; ++i) { // the picture, then the memory
        clock->Advance(6s);
        bench.Storages().DoDue();
    }
    EXPECT_FALSE(bench.Storages().NextDue());
}

TEST(WindowStorages, KeepNoMoreThanTheLimitOfWhatNobodyHolds) {
    StoragesBench bench;
    bench.Begin();
    std::vector<CGWindowID> windows;
    for (int i = 0; i < 5; ++i) // of 16 MB each
        windows.push_back(bench.Show({0, 0, 2000, 2000}));
    ASSERT_EQ(bench.Take(windows).picture->layers.size(), 5U);
    EXPECT_EQ(bench.Storages().TrafficSoFar().fetches, 5U);
    const auto held = bench.Take(windows).picture;
    const std::uint64_t fetches = bench.Storages().TrafficSoFar().fetches;
    EXPECT_GT(fetches, 5U);
    EXPECT_LT(fetches, 10U);
    bench.Take(windows);
    EXPECT_EQ(bench.Storages().TrafficSoFar().fetches, fetches) << "what is held was dropped";
}

TEST(WindowStorages, WorkThroughTheSocketWhenTheServerRefusesSharedMemory) {
    StoragesBench bench({.arguments = {"-extension", "MIT-SHM"}});
    ASSERT_FALSE(bench.Connection().Has().shm);
    bench.Begin();
    const xcb_window_t window = bench.Show(PLACE);
    ASSERT_TRUE(IsAll(bench.TakeOne(window), GREEN));
    bench.Fill(window, 0x0000FF, {13, 17, 20, 21});
    bench.Settle();
    const PicturePtr changed = bench.TakeOne(window);
    ASSERT_NE(changed, nullptr);
    EXPECT_EQ(CountOf(*changed, BLUE), 7 * 4);
    EXPECT_EQ(PixelAt(*changed, 19, 20), BLUE);
}

} // namespace
