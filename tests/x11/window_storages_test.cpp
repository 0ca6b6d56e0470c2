// SPDX-License-Identifier: Apache-2.0
#include "tests/x11/storages_bench.h"

namespace {

using namespace platform;
using namespace platform::x11;
using namespace std::chrono_literals;
using Look = StoragesBench::Look;

constexpr std::uint32_t GREEN = 0xFF00FF00;
constexpr std::uint32_t BLUE = 0xFF0000FF;
constexpr std::uint32_t RED = 0xFFFF0000; // only what must not be seen
constexpr PixelRect PLACE{40, 30, 240, 130};
constexpr int AREA = 200 * 100;

TEST(WindowStorages, ShowAWindowWholeThatIsCovered) {
    StoragesBench bench;
    bench.Begin();
    const xcb_window_t window = bench.Show(PLACE);
    bench.Show({0, 0, 400, 400}, {.background = 0xFF0000});
    const PictureLayer layer = bench.TakeLayer(window);
    ASSERT_TRUE(IsAll(layer.picture, GREEN));
    EXPECT_EQ(layer.frame, (CGRect{{40, 30}, {200, 100}}));
    EXPECT_EQ(layer.picture->width, 200);
    EXPECT_EQ(layer.picture->height, 100);
    EXPECT_EQ(layer.alpha, 1.0F);
    EXPECT_FALSE(layer.stale);
}

TEST(WindowStorages, ShowWhatHangsOverTheEdgesOfTheScreen) {
    StoragesBench bench;
    bench.Begin();
    const xcb_window_t window = bench.Show({-150, -60, 50, 40});
    EXPECT_TRUE(IsAll(bench.TakeOne(window), GREEN));
    // Beyond all edges there is no copy, so what is told first could be that, and isn't believed.
    const xcb_window_t outside = bench.Show({5000, 5000, 5100, 5100});
    bench.PaintOnExposure(outside, 0x00FF00);
    EXPECT_TRUE(bench.ComesTrueMeanwhile([&] { return IsAll(bench.TakeOne(outside), GREEN); }));
}

TEST(WindowStorages, ShowTheBorderToo) {
    StoragesBench bench;
    bench.Begin();
    const xcb_window_t window = bench.Show(PLACE, {.border = 7});
    ASSERT_TRUE(bench.ComesTrueMeanwhile([&] {
        const PicturePtr picture = bench.TakeOne(window);
        return picture != nullptr && CountOf(*picture, GREEN) == AREA &&
               CountOf(*picture, BLUE) == 214 * 114 - AREA;
    }));
    bench.Fill(window, 0x0000FF, {0, 0, 10, 10});
    bench.Settle();
    const PicturePtr picture = bench.TakeOne(window);
    ASSERT_NE(picture, nullptr);
    EXPECT_EQ(PixelAt(*picture, 7 + 9, 7 + 9), BLUE);
    EXPECT_EQ(PixelAt(*picture, 7 + 10, 7 + 10), GREEN);
    EXPECT_EQ(CountOf(*picture, GREEN), AREA - 100);
}

TEST(WindowStorages, ListLayersFromTheBackToTheFront) {
    StoragesBench bench;
    bench.Begin();
    const xcb_window_t back = bench.Show(PLACE);
    const xcb_window_t middle = bench.Show(PLACE);
    const xcb_window_t front = bench.Show(PLACE);
    const auto taken = bench.Take({front, back, 12345, front, middle});
    ASSERT_EQ(taken.outcome, PictureOutcome::Ok);
    ASSERT_EQ(taken.picture->layers.size(), 3U);
    EXPECT_EQ(taken.picture->layers[0].window, back);
    EXPECT_EQ(taken.picture->layers[1].window, middle);
    EXPECT_EQ(taken.picture->layers[2].window, front);
    EXPECT_EQ(taken.picture->generation, bench.Tree().Generation());
}

TEST(WindowStorages, LeaveOutWhatNobodyLooksAt) {
    StoragesBench bench;
    bench.Begin();
    const xcb_window_t window = bench.Show(PLACE);
    const auto taken = bench.Take({window}, {{240, 0}, {100, 100}});
    ASSERT_EQ(taken.outcome, PictureOutcome::Ok);
    EXPECT_TRUE(taken.picture->layers.empty());
    EXPECT_EQ(bench.Storages().TrafficSoFar().fetches, 0U);
}

TEST(WindowStorages, SayGoneForWindowsThatAreNotThereAnyMore) {
    StoragesBench bench;
    bench.Begin();
    const xcb_window_t window = bench.Show(PLACE);
    const xcb_window_t other = bench.Show(PLACE);
    ASSERT_NE(bench.TakeOne(window), nullptr);
    xcb_destroy_window(bench.Client(), window);
    bench.Link().RoundTrip(); // the storages haven't heard of it
    const auto both = bench.Take({window, other});
    ASSERT_EQ(both.outcome, PictureOutcome::Ok);
    ASSERT_EQ(both.picture->layers.size(), 1U);
    EXPECT_EQ(both.picture->layers[0].window, other);
    EXPECT_EQ(bench.Take({window}).outcome, PictureOutcome::Gone);
}

TEST(WindowStorages, SurviveAWindowThatGoesBetweenTheListAndTheFetch) {
    StoragesBench bench;
    bench.Begin();
    const xcb_window_t window = bench.Show(PLACE);
    WindowPictureRequest request;
    request.windows = {window};
    request.rect = {{0, 0}, {1000, 1000}};
    int calls = 0;
    const auto taken = bench.Storages().Take(request, bench.Tree(), {}, [&] {
        bench.CatchUp();
        if (++calls == 1) { // after the events were taken in, before anything is fetched
            xcb_destroy_window(bench.Client(), window);
            bench.Link().RoundTrip();
        }
    });
    EXPECT_EQ(taken.outcome, PictureOutcome::Gone);
}

TEST(WindowStorages, HoldTheServerWhenTheStackNeverStandsStill) {
    StoragesBench bench;
    bench.Begin();
    const xcb_window_t window = bench.Show(PLACE);
    WindowPictureRequest request;
    request.windows = {window};
    request.rect = {{0, 0}, {1000, 1000}};
    int calls = 0;
    const auto taken = bench.Storages().Take(request, bench.Tree(), {}, [&] {
        // With the server held nobody would answer the client; what it asks for then waits.
        bench.Move(window, ++calls, 0);
        if (calls <= 6)
            bench.Link().RoundTrip();
        xcb_flush(bench.Client());
        bench.Connection().RoundTrip();
        bench.CatchUp();
    });
    ASSERT_EQ(taken.outcome, PictureOutcome::Ok);
    EXPECT_GE(calls, 7);
    EXPECT_EQ(taken.picture->generation, bench.Tree().Generation());
    EXPECT_EQ(taken.picture->layers.size(), 1U);
}

TEST(WindowStorages, FollowTheSizeOfAWindow) {
    StoragesBench bench;
    bench.Begin();
    const xcb_window_t window = bench.Show(PLACE);
    bench.PaintOnExposure(window, 0x00FF00);
    ASSERT_TRUE(IsAll(bench.TakeOne(window), GREEN));
    for (const auto& [width, height] : {std::pair{300U, 150U}, {80U, 40U}}) {
        bench.Resize(window, width, height);
        EXPECT_TRUE(bench.ComesTrueMeanwhile([&, w = width, h = height] {
            const PicturePtr picture = bench.TakeOne(window);
            return IsAll(picture, GREEN) && picture->width == static_cast<int>(w) &&
                   picture->height == static_cast<int>(h);
        }));
    }
}

TEST(WindowStorages, ShowTheLastPictureOfAnUnmappedWindowAsStale) {
    CManualClockScope clock;
    StoragesBench bench;
    bench.Begin();
    const xcb_atom_t state = bench.Link().Atom("WM_STATE");
    const auto managed = [&] { // by what a window manager leaves on it, also while it is unmapped
        const xcb_window_t window = bench.Create(PLACE, {.overrideRedirect = false});
        const std::uint32_t normal[] = {1, 0};
        xcb_change_property(bench.Client(), XCB_PROP_MODE_REPLACE, window, state, state, 32, 2, normal);
        bench.Settle();
        xcb_map_window(bench.Client(), window);
        bench.Settle();
        return window;
    };
    const xcb_window_t window = managed();
    const xcb_window_t unseen = managed();
    const PicturePtr last = bench.TakeOne(window);
    ASSERT_TRUE(IsAll(last, GREEN));
    xcb_unmap_window(bench.Client(), window);
    xcb_unmap_window(bench.Client(), unseen);
    bench.Settle();
    const auto taken = bench.Take({window, unseen});
    ASSERT_EQ(taken.outcome, PictureOutcome::Ok);
    ASSERT_EQ(taken.picture->layers.size(), 1U);
    EXPECT_EQ(taken.picture->layers[0].window, window);
    EXPECT_EQ(taken.picture->layers[0].picture, last);
    EXPECT_TRUE(taken.picture->layers[0].stale);
    clock->Advance(59s);
    bench.Storages().DoDue();
    EXPECT_EQ(bench.TakeOne(window), last);
    clock->Advance(60s);
    bench.Storages().DoDue();
    EXPECT_EQ(bench.TakeOne(window), nullptr);
    xcb_map_window(bench.Client(), window);
    bench.Settle();
    const PictureLayer again = bench.TakeLayer(window);
    EXPECT_TRUE(IsAll(again.picture, GREEN));
    EXPECT_FALSE(again.stale);
}

TEST(WindowStorages, HideWhatIsOutsideAShape) {
    StoragesBench bench;
    bench.Begin();
    bench.Show({0, 0, 600, 500}, {.background = 0xFF0000});
    const xcb_window_t window = bench.Create(PLACE);
    const xcb_rectangle_t shape[] = {{0, 0, 50, 100}, {100, 20, 60, 30}};
    xcb_shape_rectangles(bench.Client(), XCB_SHAPE_SO_SET, XCB_SHAPE_SK_BOUNDING, XCB_CLIP_ORDERING_UNSORTED,
                         window, 0, 0, 2, shape);
    bench.Settle();
    xcb_map_window(bench.Client(), window);
    bench.Settle();
    const PictureLayer layer = bench.TakeLayer(window);
    ASSERT_NE(layer.picture, nullptr);
    EXPECT_EQ(layer.frame, (CGRect{{40, 30}, {160, 100}})) << "the shape's bounds";
    EXPECT_EQ(layer.picture->format, PixelFormat::BGRA);
    EXPECT_EQ(CountOf(*layer.picture, GREEN), 50 * 100 + 60 * 30);
    EXPECT_EQ(CountOf(*layer.picture, 0), 160 * 100 - 50 * 100 - 60 * 30);
    EXPECT_EQ(bench.TakeOne(window), layer.picture);
    // What becomes visible hasn't been painted in the storage when it has no background.
    xcb_shape_mask(bench.Client(), XCB_SHAPE_SO_SET, XCB_SHAPE_SK_BOUNDING, window, 0, 0, XCB_NONE);
    bench.Settle();
    EXPECT_TRUE(bench.ComesTrueMeanwhile([&] {
        const PicturePtr picture = bench.TakeOne(window);
        EXPECT_TRUE(picture == nullptr || CountOf(*picture, RED) == 0);
        return IsAll(picture, GREEN);
    }));
}

TEST(WindowStorages, GiveOutAlphaOnlyUnderACompositor) {
    for (const bool composited : {false, true}) {
        StoragesBench bench;
        bench.Begin(composited);
        const xcb_window_t window = bench.Show(PLACE, {.background = 0x80004000, .depth = 32});
        const PicturePtr picture = bench.TakeOne(window);
        ASSERT_NE(picture, nullptr);
        EXPECT_EQ(picture->format, composited ? PixelFormat::BGRA : PixelFormat::BGRX);
        EXPECT_TRUE(IsAll(picture, composited ? 0x80004000 : 0xFF004000));
    }
}

TEST(WindowStorages, ReadServersOfOtherDepths) {
    for (const int depth : {16, 30}) {
        StoragesBench bench({.depth = depth});
        bench.Begin();
        const std::uint32_t full = depth == 16 ? 0x07E0U : 0x3FFU << 10U;
        const xcb_window_t window = bench.Show({10, 10, 111, 61}, {.background = full});
        const PicturePtr picture = bench.TakeOne(window);
        ASSERT_TRUE(IsAll(picture, GREEN)) << depth;
        EXPECT_EQ(picture->format, depth == 16 ? PixelFormat::BGRX : PixelFormat::X2R10G10B10);
        bench.Fill(window, depth == 16 ? 0x001FU : 0x3FFU, {100, 50, 101, 51});
        bench.Settle();
        const PicturePtr changed = bench.TakeOne(window);
        ASSERT_NE(changed, nullptr);
        EXPECT_EQ(PixelAt(*changed, 100, 50), BLUE);
        EXPECT_EQ(CountOf(*changed, GREEN), 101 * 51 - 1);
    }
}

TEST(WindowStorages, ShowAWindowThirtyThousandPixelsWide) {
    StoragesBench bench;
    bench.Begin();
    const xcb_window_t window = bench.Show({-100, 10, 29900, 110});
    bench.Fill(window, 0x0000FF, {29990, 90, 30000, 100});
    bench.Settle();
    const PicturePtr picture = bench.TakeOne(window);
    ASSERT_NE(picture, nullptr);
    EXPECT_EQ(picture->width, 30000);
    EXPECT_EQ(CountOf(*picture, BLUE), 100);
    EXPECT_EQ(CountOf(*picture, GREEN), 30000 * 100 - 100);
}

TEST(WindowStorages, ShowTheWallpaperAsTheRearmost) {
    StoragesBench bench({.width = 640, .height = 480});
    xcb_connection_t* const client = bench.Client();
    const xcb_pixmap_t pixmap = xcb_generate_id(client);
    xcb_create_pixmap(client, 24, pixmap, bench.Link().Root(), 640, 480);
    bench.Fill(pixmap, 0x0000FF, {0, 0, 640, 480});
    const xcb_atom_t property = bench.Link().Atom("_XROOTPMAP_ID");
    xcb_change_property(client, XCB_PROP_MODE_REPLACE, bench.Link().Root(), property, XCB_ATOM_PIXMAP, 32, 1,
                        &pixmap);
    bench.Link().RoundTrip();
    bench.Begin();
    const xcb_window_t window = bench.Show(PLACE);
    const auto taken = bench.Take({window, bench.Link().Root()});
    ASSERT_EQ(taken.outcome, PictureOutcome::Ok);
    ASSERT_EQ(taken.picture->layers.size(), 2U);
    EXPECT_EQ(taken.picture->layers[0].window, bench.Link().Root());
    EXPECT_TRUE(IsAll(taken.picture->layers[0].picture, BLUE));
    EXPECT_EQ(taken.picture->layers[0].picture->width, 640);
    xcb_free_pixmap(client, pixmap);
    xcb_change_property(client, XCB_PROP_MODE_REPLACE, bench.Link().Root(), property, XCB_ATOM_PIXMAP, 32, 1,
                        &window); // which is no pixmap
    bench.Settle();
    EXPECT_EQ(bench.Take({window, bench.Link().Root()}).outcome, PictureOutcome::Ok);
}

} // namespace
