// SPDX-License-Identifier: Apache-2.0
#include "tests/support/test_effort.h"
#include "tests/x11/storages_bench.h"

#include <xcb/composite.h>

#include <cstdio>
#include <random>

/// A storage that is new shows what was behind the window: here a secret, which is pure red and never shared.

namespace {

using namespace platform;
using namespace platform::x11;
using namespace std::chrono_literals;
using Look = StoragesBench::Look;

constexpr std::uint32_t GREEN = 0xFF00FF00;
constexpr std::uint32_t RED = 0xFFFF0000;
constexpr std::uint32_t BLUE = 0xFF0000FF;
constexpr PixelRect PLACE{40, 30, 240, 130};
constexpr int AREA = 200 * 100;
const Look NONE{.background = std::nullopt};
const Look SECRET{.background = 0xFF0000};

int RedOf(const PicturePtr& picture) {
    return picture != nullptr ? CountOf(*picture, RED) : 0;
}

/// How much of the secret the server itself keeps for a window: without any, there is nothing to leak.
int RedInStorage(StoragesBench& bench, xcb_window_t window) {
    xcb_connection_t* const xcb = bench.Client();
    const xcb_pixmap_t pixmap = xcb_generate_id(xcb);
    xcb_composite_name_window_pixmap(xcb, window, pixmap);
    const Malloced<xcb_get_geometry_reply_t> size(
        xcb_get_geometry_reply(xcb, xcb_get_geometry(xcb, pixmap), nullptr));
    if (size == nullptr)
        return 0;
    const auto cookie =
        xcb_get_image(xcb, XCB_IMAGE_FORMAT_Z_PIXMAP, pixmap, 0, 0, size->width, size->height, 0xFFFFFFFFU);
    const Malloced<xcb_get_image_reply_t> image(xcb_get_image_reply(xcb, cookie, nullptr));
    xcb_free_pixmap(xcb, pixmap);
    if (image == nullptr)
        return 0;
    Picture picture;
    picture.width = size->width;
    picture.height = size->height;
    picture.stride = std::size_t{size->width} * 4;
    picture.pixels = xcb_get_image_data(image.get());
    return CountOf(picture, RED);
}

TEST(WithheldPixels, ShowAWindowWithABackgroundAtOnce) {
    StoragesBench bench;
    bench.Begin();
    bench.Show({0, 0, 600, 500}, SECRET);
    const xcb_window_t window = bench.Show(PLACE);
    EXPECT_TRUE(IsAll(bench.TakeOne(window), GREEN));
}

TEST(WithheldPixels, HideWhatAWindowWithoutABackgroundHasNotPainted) {
    StoragesBench bench;
    bench.Begin();
    bench.Show({0, 0, 600, 500}, SECRET);
    const xcb_window_t window = bench.Show(PLACE, NONE);
    ASSERT_EQ(RedInStorage(bench, window), AREA) << "the server has changed its ways";
    EXPECT_EQ(bench.TakeOne(window), nullptr) << "a window with nothing to show has no layer";
    bench.Fill(window, 0x00FF00, {0, 0, 50, 100});
    bench.Settle();
    const PicturePtr half = bench.TakeOne(window);
    ASSERT_NE(half, nullptr);
    EXPECT_EQ(half->format, PixelFormat::BGRA);
    EXPECT_EQ(CountOf(*half, GREEN), 50 * 100);
    EXPECT_EQ(CountOf(*half, 0), AREA - 50 * 100);
    bench.Fill(window, 0x0000FF, {50, 0, 200, 100});
    bench.Settle();
    const PicturePtr whole = bench.TakeOne(window);
    ASSERT_NE(whole, nullptr);
    EXPECT_EQ(whole->format, PixelFormat::BGRX);
    EXPECT_EQ(CountOf(*whole, GREEN), 50 * 100);
    EXPECT_EQ(CountOf(*whole, BLUE), 150 * 100);
}

TEST(WithheldPixels, HideThemWhenTheWindowIsMappedBeforeAnybodyCouldWatch) {
    StoragesBench bench;
    bench.Begin();
    bench.Show({0, 0, 600, 500}, SECRET);
    const xcb_window_t window = bench.Create(PLACE, NONE);
    xcb_map_window(bench.Client(), window); // in the same breath
    bench.Settle();
    ASSERT_EQ(RedInStorage(bench, window), AREA);
    for (int i = 0; i < 3; ++i) {
        EXPECT_EQ(bench.TakeOne(window), nullptr);
        bench.Settle();
    }
    bench.Fill(window, 0x00FF00, {0, 0, 200, 100});
    bench.Settle();
    EXPECT_TRUE(IsAll(bench.TakeOne(window), GREEN));
}

TEST(WithheldPixels, HideThemAfterEveryKindOfRenewal) {
    StoragesBench bench;
    bench.Begin();
    const xcb_window_t window = bench.Show(PLACE, NONE);
    bench.Fill(window, 0x00FF00, {0, 0, 200, 100});
    bench.Settle();
    ASSERT_TRUE(IsAll(bench.TakeOne(window), GREEN));
    bench.Show({0, 0, 600, 500}, SECRET);
    const std::vector<std::function<void()>> renewals{
        [&] { bench.Resize(window, 300, 150); },
        [&] { bench.Resize(window, 100, 50); },
        [&] { bench.Configure(window, XCB_CONFIG_WINDOW_BORDER_WIDTH, {4}); },
        [&] {
            bench.Configure(window,
                            XCB_CONFIG_WINDOW_X | XCB_CONFIG_WINDOW_Y | XCB_CONFIG_WINDOW_WIDTH |
                                XCB_CONFIG_WINDOW_HEIGHT,
                            {20, 20, 200, 100});
        },
        [&] {
            xcb_unmap_window(bench.Client(), window);
            xcb_map_window(bench.Client(), window);
        },
    };
    for (std::size_t kind = 0; kind < renewals.size(); ++kind) {
        renewals[kind]();
        bench.Settle();
        EXPECT_TRUE(kind == 2 || RedInStorage(bench, window) > 0) << kind; // a border leaves the inside
        for (int i = 0; i < 4; ++i) {
            EXPECT_EQ(RedOf(bench.TakeOne(window)), 0) << kind;
            bench.Settle();
        }
        bench.Fill(window, 0x00FF00, {0, 0, 600, 600});
        bench.Settle();
        EXPECT_EQ(RedOf(bench.TakeOne(window)), 0);
        EXPECT_GT(CountOf(*bench.TakeOne(window), GREEN), 4000);
    }
}

TEST(WithheldPixels, AreNotProvenByAMove) {
    StoragesBench bench;
    bench.Begin();
    bench.Show({0, 0, 600, 500}, SECRET);
    // One of them partly beyond the edge, where coming in is told in two reports.
    for (const PixelRect& place : {PLACE, PixelRect{-100, -40, 100, 60}}) {
        const xcb_window_t window = bench.Show(place, NONE);
        ASSERT_GT(RedInStorage(bench, window), 0);
        for (const auto& [x, y] : {std::pair{50, 60}, {90, 20}, {-50, -20}, {300, 300}}) {
            bench.TakeOne(window);
            bench.Move(window, x, y);
            bench.Settle();
            ASSERT_GT(RedInStorage(bench, window), 0);
            EXPECT_EQ(RedOf(bench.TakeOne(window)), 0) << x << "," << y;
        }
        bench.Fill(window, 0x00FF00, {0, 0, 200, 100});
        bench.Settle();
        EXPECT_TRUE(IsAll(bench.TakeOne(window), GREEN));
    }
}

TEST(WithheldPixels, AreNotProvenByABorder) {
    StoragesBench bench;
    bench.Begin();
    bench.Show({0, 0, 600, 500}, SECRET);
    const xcb_window_t window = bench.Show(PLACE, {.background = std::nullopt, .border = 3});
    ASSERT_EQ(RedInStorage(bench, window), AREA);
    for (const std::uint32_t pixel : {0x0000FFU, 0x00FF00U}) {
        EXPECT_EQ(RedOf(bench.TakeOne(window)), 0);
        xcb_change_window_attributes(bench.Client(), window, XCB_CW_BORDER_PIXEL, &pixel);
        bench.Settle();
    }
    EXPECT_EQ(RedOf(bench.TakeOne(window)), 0);
    bench.Fill(window, 0x0000FF, {0, 0, 200, 100});
    bench.Settle();
    const PicturePtr picture = bench.TakeOne(window);
    ASSERT_NE(picture, nullptr);
    EXPECT_EQ(CountOf(*picture, BLUE), AREA);
    EXPECT_EQ(CountOf(*picture, GREEN), 206 * 106 - AREA);
}

TEST(WithheldPixels, AreNotProvenWhenAWindowInsideIsMoved) {
    StoragesBench bench;
    bench.Begin();
    bench.Show({0, 0, 600, 500}, SECRET);
    const xcb_window_t frame = bench.Create(PLACE, NONE);
    const xcb_window_t inner = bench.CreateIn(frame, {0, 0, 100, 50}, NONE);
    xcb_map_window(bench.Client(), inner);
    bench.Settle();
    xcb_map_window(bench.Client(), frame);
    bench.Settle();
    for (int i = 1; i < 5; ++i) {
        bench.Move(inner, i * 20, i * 10);
        bench.Settle();
        EXPECT_EQ(RedOf(bench.TakeOne(frame)), 0);
    }
}

TEST(WithheldPixels, AreKnownOfWindowsThatWereThereBefore) {
    StoragesBench bench;
    const auto mapped = [&bench](const PixelRect& place, const Look& look) {
        const xcb_window_t window = bench.Create(place, look);
        xcb_map_window(bench.Client(), window);
        return window;
    };
    const xcb_window_t none = mapped(PLACE, NONE);
    const xcb_window_t painted = mapped({40, 230, 240, 330}, {.background = 0x00FF00});
    bench.Fill(none, 0x00FF00, {0, 0, 200, 100});
    mapped({140, 0, 600, 500}, SECRET);
    const xcb_window_t front = mapped({300, 300, 400, 400}, NONE);
    bench.Fill(front, 0x00FF00, {0, 0, 100, 100});
    bench.Link().RoundTrip();
    bench.Begin();
    ASSERT_EQ(RedInStorage(bench, none), 100 * 100);
    bench.Settle();
    const PicturePtr half = bench.TakeOne(none);
    ASSERT_NE(half, nullptr);
    EXPECT_EQ(CountOf(*half, RED), 0);
    EXPECT_EQ(CountOf(*half, GREEN), 100 * 100) << "what was seen is its own";
    EXPECT_EQ(CountOf(*half, 0), 100 * 100);
    EXPECT_TRUE(IsAll(bench.TakeOne(painted), GREEN)) << "its background was painted";
    EXPECT_TRUE(IsAll(bench.TakeOne(front), GREEN)) << "nothing covers it";
    bench.PaintOnExposure(none, 0x0000FF);
    EXPECT_TRUE(bench.ComesTrueMeanwhile([&] {
        const PicturePtr picture = bench.TakeOne(none);
        EXPECT_EQ(RedOf(picture), 0);
        return picture != nullptr && CountOf(*picture, BLUE) >= 100 * 100 &&
               CountOf(*picture, BLUE) + CountOf(*picture, GREEN) == AREA;
    }));
}

TEST(WithheldPixels, AreTrustedUnderACompositorThatWasThereBefore) {
    StoragesBench bench;
    xcb_composite_redirect_subwindows(bench.Client(), bench.Link().Root(), XCB_COMPOSITE_REDIRECT_AUTOMATIC);
    const xcb_window_t window = bench.Create(PLACE, NONE);
    xcb_map_window(bench.Client(), window);
    bench.Fill(window, 0x00FF00, {0, 0, 200, 100});
    xcb_map_window(bench.Client(), bench.Create({0, 0, 600, 500}, SECRET));
    bench.Link().RoundTrip();
    bench.Begin(true);
    EXPECT_TRUE(IsAll(bench.TakeOne(window), GREEN));
}

TEST(WithheldPixels, ComeByAskingTheWindowToPaint) {
    CManualClockScope clock;
    StoragesBench bench;
    bench.Begin();
    bench.Show({0, 0, 600, 500}, SECRET);
    const xcb_window_t window = bench.Show(PLACE, NONE);
    const xcb_window_t inner = bench.CreateIn(window, {20, 10, 120, 60}, NONE);
    xcb_map_window(bench.Client(), inner);
    bench.Settle();
    bench.AnswerExposures();
    bench.PaintOnExposure(window, 0x00FF00);
    bench.PaintOnExposure(inner, 0x0000FF);
    clock->Advance(1s);
    bench.Storages().DoDue();
    bench.Settle();
    bench.AnswerExposures();
    EXPECT_EQ(bench.ToldExposures(), 0U) << "nobody has asked for it";
    ASSERT_EQ(bench.TakeOne(window), nullptr);
    ASSERT_TRUE(bench.Storages().NextDue());
    EXPECT_EQ(*bench.Storages().NextDue(), CmSteadyNow() + 40ms);
    clock->Advance(40ms);
    bench.Storages().DoDue();
    bench.Settle();
    bench.AnswerExposures();
    EXPECT_GE(bench.ToldExposures(), 2U);
    bench.Settle();
    const PicturePtr picture = bench.TakeOne(window);
    ASSERT_NE(picture, nullptr);
    EXPECT_EQ(CountOf(*picture, BLUE), 100 * 50);
    EXPECT_EQ(CountOf(*picture, GREEN), AREA - 100 * 50);
    const unsigned told = bench.ToldExposures();
    clock->Advance(2s);
    bench.Storages().DoDue();
    bench.Settle();
    bench.AnswerExposures();
    EXPECT_EQ(bench.ToldExposures(), told) << "it has painted";
}

TEST(WithheldPixels, ComeLateWhenThePaintingsThatWereAskedForCountForNothing) {
    CManualClockScope clock;
    StoragesBench bench;
    bench.Begin();
    const xcb_window_t secret = bench.Show({0, 0, 600, 500}, SECRET);
    const xcb_window_t window = bench.Show(PLACE, NONE);
    const auto pass = [&] {
        clock->Advance(100ms);
        bench.Storages().DoDue();
        bench.Settle();
        return bench.TakeOne(window);
    };
    for (int i = 0; i < 15; ++i) // its client is at something else
        ASSERT_EQ(pass(), nullptr);
    // The server can't have heard of anything of ours in between, so both have the same number.
    bench.Fill(window, 0x00FF00, {0, 0, 200, 100});
    bench.Move(secret, 10, 10);
    bench.Settle();
    ASSERT_EQ(bench.TakeOne(window), nullptr);
    bench.AnswerExposures();
    bench.PaintOnExposure(window, 0x00FF00);
    PicturePtr picture;
    for (int i = 0; i < 100 && picture == nullptr; ++i) {
        picture = pass();
        bench.AnswerExposures();
    }
    EXPECT_TRUE(IsAll(picture, GREEN));
}

TEST(WithheldPixels, ComeWhereverAClientPaintsAgainThatHasPaintedMuchBefore) {
    StoragesBench bench;
    bench.Begin();
    bench.Show({0, 0, 600, 500}, SECRET);
    const xcb_window_t window = bench.Show(PLACE, NONE);
    for (int i = 0; i < 200; ++i)
        bench.Fill(window, 0x0000FF, {i, 0, i + 1, 1});
    bench.Settle();
    xcb_unmap_window(bench.Client(), window);
    bench.Settle();
    xcb_map_window(bench.Client(), window);
    bench.Settle();
    for (int y = 0; y < 100; ++y)
        bench.Fill(window, 0x00FF00, {0, y, 200, y + 1});
    bench.Settle();
    EXPECT_TRUE(IsAll(bench.TakeOne(window), GREEN));
}

TEST(WithheldPixels, ComeByForceWhenTheClientIsDeafButHasABackground) {
    CManualClockScope clock;
    StoragesBench bench;
    bench.Begin();
    bench.Show({0, 0, 600, 500}, SECRET);
    const xcb_window_t window = bench.Create(PLACE);
    xcb_map_window(bench.Client(), window);
    bench.Settle();
    bench.Resize(window, 210, 110);
    bench.Settle();
    for (int i = 0; i < 20 && !IsAll(bench.TakeOne(window), GREEN); ++i) {
        clock->Advance(60ms);
        bench.Storages().DoDue();
        bench.Settle();
    }
    EXPECT_TRUE(IsAll(bench.TakeOne(window), GREEN));
}

/// Somebody who handles windows without sense. Some never paint; what the others paint is green. All of what
/// is red is a secret, behind and in front of them.
class Handler {
public:
    Handler(StoragesBench& bench, unsigned seed) : m_bench(bench), m_random(seed) {
        for (int i = 0; i < 4; ++i) {
            const PixelRect place{i * 100, i * 50, i * 100 + 200, i * 50 + 100};
            m_windows.push_back(bench.Create(place, NONE));
            m_inner.push_back(bench.CreateIn(m_windows.back(), {5, 5, 60, 60}, NONE));
            xcb_map_window(bench.Client(), m_inner.back());
        }
        for (int i = 0; i < 2; ++i)
            m_secrets.push_back(bench.Show({i * 150, 50, i * 150 + 250, 250}, SECRET));
    }

    void Step() {
        const auto number = static_cast<std::size_t>(Pick(4));
        const xcb_window_t window = Pick(4) == 0 ? m_secrets[number % 2] : m_windows[number];
        const int step = Pick(16);
        if (step == 0)
            xcb_unmap_window(m_bench.Client(), window);
        else if (step == 1)
            m_bench.Resize(window, Number(300), Number(200));
        else if (step == 2)
            m_bench.Move(window, Pick(1300) - 100, Pick(800) - 100);
        else if (step == 3)
            m_bench.Configure(window, XCB_CONFIG_WINDOW_STACK_MODE,
                              {Pick(2) == 0 ? XCB_STACK_MODE_ABOVE : XCB_STACK_MODE_BELOW});
        else if (step == 4)
            m_bench.Configure(window, 15, {Number(400), Number(300), Number(300), Number(200)});
        else if (step == 5)
            m_bench.Move(m_inner[number], Pick(80), Pick(80));
        else if (step == 6)
            m_bench.Configure(window, XCB_CONFIG_WINDOW_BORDER_WIDTH, {Number(4) - 1});
        else if (step == 7)
            Shape(window);
        else if (step < 13 && number < 2)
            m_bench.Fill(m_windows[number], 0x00FF00, {Pick(50), Pick(50), 50 + Pick(150), 50 + Pick(50)});
        else
            xcb_map_window(m_bench.Client(), window);
    }

    std::vector<CGWindowID> Windows() const { return {m_windows.begin(), m_windows.end()}; }
    int Pick(int count) { return static_cast<int>(m_random() % static_cast<unsigned>(count)); }

private:
    std::uint32_t Number(int last) { return static_cast<std::uint32_t>(1 + Pick(last)); }

    void Shape(xcb_window_t window) {
        const xcb_rectangle_t part{static_cast<std::int16_t>(Pick(50)), static_cast<std::int16_t>(Pick(50)),
                                   static_cast<std::uint16_t>(Number(150)),
                                   static_cast<std::uint16_t>(Number(100))};
        if (Pick(2) == 0)
            xcb_shape_mask(m_bench.Client(), XCB_SHAPE_SO_SET, XCB_SHAPE_SK_BOUNDING, window, 0, 0, XCB_NONE);
        else
            xcb_shape_rectangles(m_bench.Client(), XCB_SHAPE_SO_SET, XCB_SHAPE_SK_BOUNDING,
                                 XCB_CLIP_ORDERING_UNSORTED, window, 0, 0, 1, &part);
    }

    StoragesBench& m_bench;
    std::mt19937 m_random;
    std::vector<xcb_window_t> m_windows;
    std::vector<xcb_window_t> m_inner;
    std::vector<xcb_window_t> m_secrets;
};

TEST(WithheldPixels, NeverComeOutHoweverWindowsAreHandled) {
    StoragesBench bench;
    bench.Begin();
    bench.Show({0, 0, 1200, 700}, SECRET);
    const int rounds = 1000 * TestEffort();
    const int wish = GTEST_FLAG_GET(random_seed);
    const unsigned seed = wish != 0 ? static_cast<unsigned>(wish) : 20;
    Handler handler(bench, seed);
    int pictures = 0;
    int withheld = 0;
    int shown = 0;
    for (int round = 0; round < rounds; ++round) {
        for (int steps = handler.Pick(3); steps >= 0; --steps)
            handler.Step();
        if (handler.Pick(3) == 0)
            bench.Link().RoundTrip(); // or it happens meanwhile
        else
            xcb_flush(bench.Client());
        bench.Storages().DoDue();
        const auto taken = bench.Take(handler.Windows());
        if (taken.picture == nullptr)
            continue;
        for (const PictureLayer& layer : taken.picture->layers) {
            ASSERT_EQ(CountOf(*layer.picture, RED), 0) << "round " << round << ", seed " << seed;
            shown += CountOf(*layer.picture, GREEN) > 0 ? 1 : 0;
            ++pictures;
        }
        for (const CGWindowID each : handler.Windows())
            withheld += round % 50 == 0 && RedInStorage(bench, each) > 0 ? 1 : 0;
    }
    EXPECT_GT(withheld, 0);
    EXPECT_GT(shown, 0);
    std::printf(
        "%d rounds, seed %u: %d pictures, %d with content; %d of the storages looked at held secrets\n",
        rounds, seed, pictures, shown, withheld);
}

} // namespace
