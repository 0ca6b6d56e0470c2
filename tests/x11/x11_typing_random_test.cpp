// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/x11_window_server.h"
#include "tests/support/test_effort.h"
#include "tests/x11/component_bench.h"
#include "tests/x11/x11_fixture.h"

#include <gtest/gtest.h>

#include <atomic>
#include <iostream>
#include <random>
#include <thread>
#include <vector>

/// A window in which somebody writes, here and there, and now and then a film runs, looked at meanwhile: what
/// has been painted is in the next picture, pixel by pixel, wherever it was expected.
namespace {

using namespace platform;

constexpr int WIDTH = 200;
constexpr int HEIGHT = 150;

/// Paints and remembers what; one thread at a time.
class Writer {
public:
    Writer(const std::string& display, unsigned seed)
        : m_link(display),
          m_window(xcb_generate_id(m_link.Get())),
          m_context(xcb_generate_id(m_link.Get())),
          m_random(seed),
          m_pixels(std::size_t{WIDTH} * HEIGHT) {
        const std::uint32_t colour = 0;
        xcb_create_window(m_link.Get(), XCB_COPY_FROM_PARENT, m_window, m_link.Root(), 20, 30, WIDTH, HEIGHT,
                          0, XCB_WINDOW_CLASS_INPUT_OUTPUT, XCB_COPY_FROM_PARENT, XCB_CW_BACK_PIXEL, &colour);
        xcb_create_gc(m_link.Get(), m_context, m_window, 0, nullptr);
        xcb_map_window(m_link.Get(), m_window);
        Fill({0, 0, WIDTH, HEIGHT});
        Settle();
    }

    /// A letter at the caret, which moves on; now and then somewhere else, or something larger. For some time
    /// it is mostly the same rows, time and again.
    void Write() {
        if (m_film == 0 && Number(20) == 0)
            BeginFilm();
        if (m_film > 0) {
            --m_film;
            Fill(m_screen);
            xcb_flush(m_link.Get());
            if (Number(6) != 0)
                return;
        }
        if (Number(12) == 0 || m_x + 8 > WIDTH) {
            m_x = Number(WIDTH - 8);
            m_y = Number(HEIGHT - 12);
        }
        if (Number(15) == 0)
            Fill({0, static_cast<std::int16_t>(m_y), WIDTH, 10});
        Fill({static_cast<std::int16_t>(m_x), static_cast<std::int16_t>(m_y), 8, 12});
        m_x += Number(3) == 0 ? 0 : 8;
        xcb_flush(m_link.Get());
    }

    void Settle() {
        m_link.RoundTrip();
        m_link.RoundTrip();
    }

    testing::AssertionResult IsShownBy(const Picture& picture) const {
        if (picture.width != WIDTH || picture.height != HEIGHT)
            return testing::AssertionFailure() << "a picture of another size";
        for (int y = 0; y < HEIGHT; ++y) {
            for (int x = 0; x < WIDTH; ++x) {
                const std::uint32_t is = ArgbAt(picture, x, y) & 0xFFFFFFU;
                if (is != m_pixels[Index(x, y)])
                    return testing::AssertionFailure() << "at " << x << "," << y << " is " << std::hex << is
                                                       << " instead of " << m_pixels[Index(x, y)];
            }
        }
        return testing::AssertionSuccess();
    }

    int Number(int end) { return static_cast<int>(m_random() % static_cast<unsigned>(end)); }

private:
    void BeginFilm() {
        m_film = 12;
        const int top = Number(HEIGHT - 60);
        m_screen = {static_cast<std::int16_t>(Number(20)), static_cast<std::int16_t>(top), WIDTH - 40,
                    static_cast<std::uint16_t>(20 + Number(40))};
    }

    static std::size_t Index(int x, int y) {
        return static_cast<std::size_t>(y) * WIDTH + static_cast<std::size_t>(x);
    }

    void Fill(const xcb_rectangle_t& rect) {
        const auto colour = static_cast<std::uint32_t>(m_random() & 0xFFFFFFU);
        xcb_change_gc(m_link.Get(), m_context, XCB_GC_FOREGROUND, &colour);
        xcb_poly_fill_rectangle(m_link.Get(), m_window, m_context, 1, &rect);
        for (int y = rect.y; y < std::min(rect.y + rect.height, HEIGHT); ++y) {
            for (int x = rect.x; x < std::min(rect.x + rect.width, WIDTH); ++x)
                m_pixels[Index(x, y)] = colour;
        }
    }

    const XLink m_link;
    const xcb_window_t m_window;
    const xcb_gcontext_t m_context;
    std::mt19937 m_random;
    std::vector<std::uint32_t> m_pixels;
    int m_x = 0;
    int m_y = 0;
    int m_film = 0; // pictures of it to come
    xcb_rectangle_t m_screen{};
};

class X11TypingRandom : public testing::Test {
protected:
    void SetUp() override {
        if (const auto missing = MissingProgram(XServer::ProgramsOf(XServerOptions::Kind::Xvfb)))
            GTEST_SKIP() << *missing;
        const unsigned seed = std::random_device{}();
        std::cout << "seed " << seed << '\n';
        m_rig.emplace(SmallServer(XServerOptions::Kind::Xvfb));
        writer.emplace(m_rig->Display(), seed);
        m_server.emplace(m_rig->Display());
    }

    /// The window's picture; null when it can't be had.
    PicturePtr Look() {
        WindowPictureRequest request;
        const auto listed = m_server->GetWindows();
        for (const WindowInfo& each : listed->Windows())
            request.windows.push_back(each.id);
        request.rect = {{0, 0}, {320, 240}};
        request.deadline = CmSteadyNow() + PATIENCE;
        const auto picture = m_server->TakeWindowPicture(request).picture;
        return picture != nullptr && picture->layers.size() == 1 ? picture->layers[0].picture : nullptr;
    }

    testing::AssertionResult IsShown() {
        const PicturePtr picture = Look();
        return picture != nullptr ? writer->IsShownBy(*picture) : testing::AssertionFailure() << "no picture";
    }

    std::optional<Writer> writer;

private:
    const CBrokenPipeBlocked m_blocked;
    std::optional<XServer> m_rig;
    std::optional<X11WindowServer> m_server;
};

TEST_F(X11TypingRandom, IsInTheVeryNextPicture) {
    ASSERT_TRUE(IsShown());
    for (int i = 0; i < TestRounds(400) && !HasFailure(); ++i) {
        for (int letters = writer->Number(3); letters >= 0; --letters)
            writer->Write();
        writer->Settle();
        EXPECT_TRUE(IsShown()) << "step " << i;
    }
}

TEST_F(X11TypingRandom, IsAllThereInTheEndWhenPicturesWereTakenMeanwhile) {
    ASSERT_TRUE(IsShown());
    int pictures = 0;
    PicturePtr held;
    for (int i = 0; i < TestRounds(60) && !HasFailure(); ++i) {
        std::atomic<bool> ended{false};
        std::thread writes([&] {
            for (int letters = 0; letters < 40; ++letters)
                writer->Write();
            writer->Settle();
            ended = true;
        });
        for (; !ended; ++pictures) {
            PicturePtr picture = Look();
            held = i % 2 == 0 ? std::move(picture) : nullptr;
        }
        writes.join();
        EXPECT_TRUE(IsShown()) << "round " << i;
    }
    EXPECT_GT(pictures, 0);
}

} // namespace
