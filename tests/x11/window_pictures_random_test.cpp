// SPDX-License-Identifier: Apache-2.0
#include "platform/picture_changes.h"
#include "tests/support/test_effort.h"
#include "tests/x11/storages_bench.h"

#include <algorithm>
#include <atomic>
#include <cstddef>
#include <random>
#include <thread>

/// Pictures of windows in which something goes on tell what is different from earlier ones: all of it, while
/// it is painted too, and not much more.
namespace {

using namespace platform;
using namespace platform::x11;
using namespace std::chrono_literals;

constexpr int WIDTH = 300;
constexpr int HEIGHT = 200;

std::size_t AreaOf(const PixelRegion& region) {
    std::size_t area = 0;
    for (const PixelRect& rect : region.Rects())
        area += static_cast<std::size_t>(rect.right - rect.left) *
                static_cast<std::size_t>(rect.bottom - rect.top);
    return area;
}

/// A picture whose memory may be used again meanwhile.
struct Copy {
    explicit Copy(const Picture& picture)
        : serial(picture.serial),
          width(picture.width),
          height(picture.height),
          format(picture.format) {
        const std::size_t row = static_cast<std::size_t>(width) * 4;
        bytes.reserve(row * static_cast<std::size_t>(height));
        for (int y = 0; y < height; ++y) {
            const std::uint8_t* const from = picture.pixels + static_cast<std::size_t>(y) * picture.stride;
            bytes.insert(bytes.end(), from, from + row);
        }
    }

    const std::uint8_t* At(int x, int y) const {
        return bytes.data() +
               (static_cast<std::size_t>(y) * static_cast<std::size_t>(width) + static_cast<std::size_t>(x)) *
                   4;
    }

    std::uint64_t serial;
    int width;
    int height;
    PixelFormat format;
    std::vector<std::uint8_t> bytes;
};

/// Where two pictures of the same size are different.
PixelRegion Difference(const Copy& one, const Copy& other) {
    PixelRegion difference;
    for (int y = 0; y < one.height; ++y) {
        int begin = -1;
        for (int x = 0; x <= one.width; ++x) {
            const bool differs = x < one.width && std::memcmp(one.At(x, y), other.At(x, y), 4) != 0;
            if (differs && begin < 0)
                begin = x;
            if (!differs && begin >= 0)
                difference.Add(PixelRect{std::exchange(begin, -1), y, x, y + 1});
        }
    }
    return difference;
}

/// Somebody who looks at a window now and then, and holds its picture or doesn't.
class Reader {
public:
    explicit Reader(bool holds) : m_holds(holds) {}

    /// False when a change was not told.
    testing::AssertionResult Look(const PicturePtr& picture) {
        if (picture == nullptr)
            return testing::AssertionSuccess();
        if (picture->serial == 0)
            return testing::AssertionFailure() << "a picture has no number";
        const Copy now(*picture);
        const testing::AssertionResult result = m_last ? Compare(*picture, now) : testing::AssertionSuccess();
        m_last = now;
        m_held = m_holds ? picture : nullptr;
        return result;
    }

    int Told() const { return m_told; }
    int Untold() const { return m_untold; }
    std::size_t ToldArea() const { return m_toldArea; }
    std::size_t DifferentArea() const { return m_differentArea; }
    const std::optional<Copy>& Last() const { return m_last; }

private:
    testing::AssertionResult Compare(const Picture& picture, const Copy& now) {
        const std::optional<PixelRegion> told = ChangesSince(picture, m_last->serial);
        if (!told) {
            ++m_untold;
            return testing::AssertionSuccess();
        }
        ++m_told;
        if (now.width != m_last->width || now.height != m_last->height || now.format != m_last->format)
            return testing::AssertionFailure() << "changes are told of another kind of picture";
        const PixelRegion all(PixelRect{0, 0, now.width, now.height});
        PixelRegion beyond = *told;
        beyond.Subtract(all);
        PixelRegion untold = Difference(*m_last, now);
        m_toldArea += AreaOf(*told);
        m_differentArea += AreaOf(untold);
        untold.Subtract(*told);
        if (untold.IsEmpty() && beyond.IsEmpty())
            return testing::AssertionSuccess();
        const PixelRect where = untold.Bounds();
        return testing::AssertionFailure()
               << "not told: " << where.left << "," << where.top << " to " << where.right << ","
               << where.bottom << " of picture " << picture.serial << " after " << m_last->serial;
    }

    const bool m_holds;
    std::optional<Copy> m_last;
    PicturePtr m_held;
    int m_told = 0;
    int m_untold = 0;
    std::size_t m_toldArea = 0;
    std::size_t m_differentArea = 0;
};

PixelRect RandomRect(std::mt19937& random) {
    const auto number = [&random](int end) {
        return static_cast<int>(random() % static_cast<unsigned>(end));
    };
    const int left = number(WIDTH) - 10;
    const int top = number(HEIGHT) - 10;
    // Little ones, wide ones, high ones.
    const int width = 1 + number(random() % 4 == 0 ? WIDTH : 30);
    const int height = 1 + number(random() % 4 == 0 ? HEIGHT : 15);
    return {left, top, left + width, top + height};
}

/// A window and its client, which does this and that.
class Window {
public:
    Window(StoragesBench& bench, unsigned seed) : m_bench(bench), m_random(seed) {
        m_window = bench.Show({50, 40, 50 + WIDTH, 40 + HEIGHT});
        bench.PaintOnExposure(m_window, 0x00FF00);
    }

    xcb_window_t Id() const { return m_window; }

    void Act() {
        const auto what = m_random() % 40;
        if (what < 28)
            Paint(1 + static_cast<int>(m_random() % 3));
        else if (what < 30)
            Paint(60); // more than a step tells one by one
        else if (what < 34)
            m_bench.Move(m_window, static_cast<int>(m_random() % 300), static_cast<int>(m_random() % 200));
        else if (what < 36)
            Reshape();
        else if (what < 37)
            MapAnew();
        else if (what < 38)
            Resize();
        m_bench.Settle();
    }

    /// What the server says is in it, where it isn't withheld.
    bool IsShownBy(const Copy& copy) const {
        xcb_connection_t* const xcb = m_bench.Client();
        xcb_get_image_reply_t* const image = xcb_get_image_reply(
            xcb,
            xcb_get_image(xcb, XCB_IMAGE_FORMAT_Z_PIXMAP, m_window, static_cast<std::int16_t>(m_seen.left),
                          static_cast<std::int16_t>(m_seen.top), static_cast<std::uint16_t>(copy.width),
                          static_cast<std::uint16_t>(copy.height), ~0U),
            nullptr);
        if (image == nullptr)
            return false;
        bool isSame = true;
        for (int y = 0; y < copy.height && isSame; ++y) {
            for (int x = 0; x < copy.width && isSame; ++x) {
                const std::size_t offset =
                    (static_cast<std::size_t>(y) * static_cast<std::size_t>(copy.width) +
                     static_cast<std::size_t>(x)) *
                    4;
                const bool isWithheld = copy.format == PixelFormat::BGRA && copy.At(x, y)[3] == 0;
                isSame = isWithheld || std::memcmp(xcb_get_image_data(image) + offset, copy.At(x, y), 3) == 0;
            }
        }
        std::free(image);
        return isSame;
    }

private:
    void Paint(int strokes) {
        for (int i = 0; i < strokes; ++i)
            m_bench.Fill(m_window, static_cast<std::uint32_t>(m_random()) & 0xFFFFFFU, RandomRect(m_random));
    }

    /// A rectangle with a hole, or whole again.
    void Reshape() {
        PixelRegion shape(PixelRect{0, 0, WIDTH, HEIGHT});
        if (m_random() % 2 == 0)
            shape.Subtract(RandomRect(m_random));
        std::vector<xcb_rectangle_t> rects;
        for (const PixelRect& rect : shape.Rects())
            rects.push_back({static_cast<std::int16_t>(rect.left), static_cast<std::int16_t>(rect.top),
                             static_cast<std::uint16_t>(rect.right - rect.left),
                             static_cast<std::uint16_t>(rect.bottom - rect.top)});
        m_seen = shape.Bounds();
        xcb_shape_rectangles(m_bench.Client(), XCB_SHAPE_SO_SET, XCB_SHAPE_SK_BOUNDING,
                             XCB_CLIP_ORDERING_UNSORTED, m_window, 0, 0,
                             static_cast<std::uint32_t>(rects.size()), rects.data());
    }

    void MapAnew() {
        xcb_unmap_window(m_bench.Client(), m_window);
        m_bench.Settle();
        xcb_map_window(m_bench.Client(), m_window);
    }

    /// To another size and back, until it is seen whole again.
    void Resize() {
        m_bench.Resize(m_window, WIDTH - 7, HEIGHT + 5);
        m_bench.Settle();
        m_bench.TakeOne(m_window);
        m_bench.Resize(m_window, WIDTH, HEIGHT);
        EXPECT_TRUE(m_bench.ComesTrueMeanwhile([&] {
            const PicturePtr picture = m_bench.TakeOne(m_window);
            return picture != nullptr && picture->width == m_seen.right - m_seen.left &&
                   IsShownBy(Copy(*picture));
        }));
    }

    StoragesBench& m_bench;
    std::mt19937 m_random;
    xcb_window_t m_window = 0;
    PixelRect m_seen{0, 0, WIDTH, HEIGHT};
};

/// As before each picture of a session.
void AskAhead(StoragesBench& bench) {
    bench.Storages().AskAhead();
    bench.Connection().RoundTrip();
    bench.CatchUp();
}

TEST(WindowPicturesRandom, TellAllThatIsDifferentFromEarlierOnes) {
    for (unsigned seed = 1; seed <= 4; ++seed) {
        StoragesBench bench({.width = 800, .height = 600});
        bench.Begin();
        Window window(bench, seed);
        std::mt19937 random(seed);
        Reader always(false);
        Reader seldom(false);
        Reader holder(true);
        for (int step = 0; step < TestRounds(250); ++step) {
            window.Act();
            if (random() % 2 == 0)
                AskAhead(bench);
            const PicturePtr picture = bench.TakeOne(window.Id());
            ASSERT_NE(picture, nullptr) << step;
            ASSERT_TRUE(always.Look(picture)) << seed << " " << step;
            ASSERT_TRUE(window.IsShownBy(*always.Last())) << seed << " " << step;
            if (random() % 5 == 0) {
                ASSERT_TRUE(seldom.Look(picture)) << seed << " " << step;
            }
            if (random() % 3 == 0) {
                ASSERT_TRUE(holder.Look(picture)) << seed << " " << step;
            }
        }
        EXPECT_GT(always.Told(), always.Untold() * 3);
        EXPECT_GT(seldom.Told(), seldom.Untold());
        EXPECT_GT(always.DifferentArea(), 0U);
    }
}

/// Paints without waiting for anybody.
class Painter {
public:
    Painter(const std::string& display, xcb_window_t window, unsigned seed)
        : m_link(display),
          m_thread([this, window, seed] { Run(window, seed); }) {}
    ~Painter() { End(); }
    Painter(const Painter&) = delete;
    Painter& operator=(const Painter&) = delete;

    void End() {
        m_ended = true;
        if (m_thread.joinable())
            m_thread.join();
    }

private:
    void Run(xcb_window_t window, unsigned seed) {
        std::mt19937 random(seed);
        const xcb_gcontext_t context = xcb_generate_id(m_link.Get());
        xcb_create_gc(m_link.Get(), context, window, 0, nullptr);
        while (!m_ended) {
            const std::uint32_t colour = static_cast<std::uint32_t>(random()) & 0xFFFFFFU;
            xcb_change_gc(m_link.Get(), context, XCB_GC_FOREGROUND, &colour);
            const PixelRect rect = RandomRect(random);
            const xcb_rectangle_t area{static_cast<std::int16_t>(rect.left),
                                       static_cast<std::int16_t>(rect.top),
                                       static_cast<std::uint16_t>(rect.right - rect.left),
                                       static_cast<std::uint16_t>(rect.bottom - rect.top)};
            xcb_poly_fill_rectangle(m_link.Get(), window, context, 1, &area);
            if (random() % 4 == 0)
                m_link.RoundTrip();
        }
        m_link.RoundTrip();
    }

    const XLink m_link;
    std::atomic<bool> m_ended{false};
    std::thread m_thread; // last: it uses all the others
};

TEST(WindowPicturesRandom, TellAllThatIsDifferentWhileSomebodyPaints) {
    for (unsigned seed = 1; seed <= 3; ++seed) {
        StoragesBench bench({.width = 800, .height = 600});
        bench.Begin();
        Window window(bench, seed);
        Reader light(false);
        Reader holder(true);
        {
            Painter painter(bench.Server().Display(), window.Id(), seed);
            for (int step = 0; step < TestRounds(300); ++step) {
                AskAhead(bench);
                const PicturePtr picture = bench.TakeOne(window.Id());
                ASSERT_TRUE(light.Look(picture)) << seed << " " << step;
                if (step % 3 == 0) {
                    ASSERT_TRUE(holder.Look(picture)) << seed << " " << step;
                }
            }
        }
        bench.Settle();
        const PicturePtr last = bench.TakeOne(window.Id());
        ASSERT_NE(last, nullptr);
        EXPECT_TRUE(window.IsShownBy(Copy(*last))) << "a change was lost";
        EXPECT_GT(light.Told(), TestRounds(300) / 2);
        EXPECT_GT(light.DifferentArea(), 0U);
    }
}

} // namespace
