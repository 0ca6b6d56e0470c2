// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/display_streams.h"
#include "platform/x11/x11_failure.h"
#include "tests/platform/conformance_checks.h"
#include "tests/support/test_effort.h"
#include "tests/support/threads.h"
#include "tests/x11/display_streams_bench.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <future>
#include <iostream>
#include <random>
#include <thread>

/// Streams of screens on which something goes on: whoever keeps a copy by their changes has the screen.
namespace platform::x11 {
namespace {

/// Paints, and moves windows about: pixels change that nobody has painted.
class Vandal {
public:
    Vandal(const std::string& display, unsigned seed) : m_link(display), m_random(seed) {
        for (int i = 0; i < 4; ++i) {
            const xcb_window_t window = xcb_generate_id(m_link.Get());
            const std::uint32_t values[] = {Number(0x1000000), 1};
            xcb_create_window(m_link.Get(), 24, window, m_link.Root(), 0, 0, 60, 40, 0,
                              XCB_WINDOW_CLASS_INPUT_OUTPUT, XCB_COPY_FROM_PARENT,
                              XCB_CW_BACK_PIXEL | XCB_CW_OVERRIDE_REDIRECT, values);
            m_windows.push_back(window);
        }
        m_context = xcb_generate_id(m_link.Get());
        const std::uint32_t mode = XCB_SUBWINDOW_MODE_INCLUDE_INFERIORS;
        xcb_create_gc(m_link.Get(), m_context, m_link.Root(), XCB_GC_SUBWINDOW_MODE, &mode);
    }

    void Act() {
        const xcb_window_t window = m_windows[m_random() % m_windows.size()];
        switch (m_random() % 6) {
            case 0:
                xcb_map_window(m_link.Get(), window);
                break;
            case 1:
                xcb_unmap_window(m_link.Get(), window);
                break;
            case 2: {
                const std::uint32_t to[] = {Number(300), Number(220)};
                xcb_configure_window(m_link.Get(), window, XCB_CONFIG_WINDOW_X | XCB_CONFIG_WINDOW_Y, to);
                break;
            }
            default:
                Paint();
        }
        xcb_flush(m_link.Get());
    }

    void RoundTrip() { m_link.RoundTrip(); }

private:
    std::uint32_t Number(unsigned end) { return static_cast<std::uint32_t>(m_random() % end); }

    void Paint() {
        const std::uint32_t colour = Number(0x1000000);
        xcb_change_gc(m_link.Get(), m_context, XCB_GC_FOREGROUND, &colour);
        const auto number = [this](unsigned end) { return static_cast<std::int16_t>(Number(end)); };
        const xcb_rectangle_t rect{number(320), number(240), static_cast<std::uint16_t>(1 + number(80)),
                                   static_cast<std::uint16_t>(1 + number(30))};
        xcb_poly_fill_rectangle(m_link.Get(), m_link.Root(), m_context, 1, &rect);
    }

    XLink m_link;
    std::mt19937 m_random;
    std::vector<xcb_window_t> m_windows;
    xcb_gcontext_t m_context = 0;
};

/// Somebody who keeps a copy, and some of the pictures.
struct Copier {
    explicit Copier(StreamReaderPtr theReader) : reader(std::move(theReader)) {}

    StreamReaderPtr reader;
    StreamCopy copy;
    PicturePtr last;
    PicturePtr held;
    std::vector<std::uint32_t> heldPixels;
    int taken = 0;

    void Take(StreamBench& bench, bool hold) {
        const DisplayPictureResult result = bench.Take(reader);
        ASSERT_TRUE(result.outcome == PictureOutcome::Ok || result.outcome == PictureOutcome::Nothing);
        if (result.picture == nullptr)
            return;
        ++taken;
        ASSERT_TRUE(IsLawful(*result.picture));
        ASSERT_TRUE(copy.Take(*result.picture));
        last = result.picture;
        if (!hold)
            return;
        if (held != nullptr) {
            ASSERT_EQ(PixelsOf(*held), heldPixels) << "a picture that is held was written to";
        }
        held = result.picture;
        heldPixels = PixelsOf(*held);
    }
};

TEST(DisplayStreams, GiveByTheirChangesWhatAFreshGrabGives) {
    if (LacksServer())
        GTEST_SKIP();
    const unsigned seed = std::random_device()();
    std::mt19937 random(seed);
    StreamBench bench(SmallServer(XServerOptions::Kind::Xvfb));
    Vandal vandal(bench.server.Display(), seed);
    Copier copiers[] = {Copier(bench.Open()), Copier(bench.Open())};
    const int count = TestRounds(200);
    for (int i = 0; i < count; ++i) {
        for (auto acts = random() % 6; acts > 0; --acts)
            vandal.Act();
        vandal.RoundTrip();
        Copier& copier = copiers[i % 4 == 3 ? 1 : 0]; // the other one's changes pile up meanwhile
        ASSERT_NO_FATAL_FAILURE(copier.Take(bench, random() % 3 == 0)) << "seed " << seed;
        ASSERT_EQ(PixelsOf(*copier.last), bench.Screen()) << "at " << i << ", seed " << seed;
    }
    std::cout << copiers[0].taken << " and " << copiers[1].taken << " pictures, seed " << seed << "\n";
    EXPECT_GT(copiers[0].taken, count / 3);
    EXPECT_GT(copiers[1].taken, count / 10);
}

/// Somebody paints all the time, and each copy is like its picture; in the end like the screen.
void CopyWhileSomebodyPaints(StreamBench& bench) {
    const unsigned seed = std::random_device()();
    std::atomic<bool> ends{false};
    std::promise<void> closes;
    std::promise<void> painted;
    std::thread painter([&] {
        Vandal vandal(bench.server.Display(), seed);
        for (int i = 0; !ends; ++i) {
            vandal.Act();
            if (i % 8 == 0)
                vandal.RoundTrip();
        }
        vandal.RoundTrip();
        painted.set_value();
        closes.get_future().wait();
    });
    Copier copiers[] = {Copier(bench.Open()), Copier(bench.Open(true))};
    const int count = TestRounds(400);
    // And then until enough was seen, which is a matter of how the threads meet.
    const std::chrono::nanoseconds limit = CmSteadyNow() + PATIENCE;
    const auto isEnough = [&] { return copiers[0].taken > count / 10 || CmSteadyNow() >= limit; };
    for (int i = 0; (i < count || !isEnough()) && !testing::Test::HasFatalFailure(); ++i)
        copiers[i % 3 == 0 ? 1 : 0].Take(bench, i % 4 == 0);
    ends = true;
    painted.get_future().wait();
    std::cout << copiers[0].taken << " and " << copiers[1].taken << " pictures, seed " << seed << "\n";
    EXPECT_GT(copiers[0].taken, count / 10);
    EXPECT_TRUE(ComesTrue([&] {
        copiers[0].Take(bench, false);
        return testing::Test::HasFatalFailure() || PixelsOf(*copiers[0].last) == bench.Screen();
    }));
    closes.set_value();
    painter.join();
}

TEST(DisplayStreams, MissNothingThatIsPaintedWhileTheyFetch) {
    if (LacksServer())
        GTEST_SKIP();
    StreamBench bench(SmallServer(XServerOptions::Kind::Xvfb));
    CopyWhileSomebodyPaints(bench);
}

TEST(DisplayStreams, MissNothingThatACompositorPaints) {
    if (LacksServer() || MissingProgram({"picom"}))
        GTEST_SKIP();
    StreamBench bench(SmallServer(XServerOptions::Kind::Xvfb));
    const std::unique_ptr<XProgram> picom = XProgram::Picom(bench.server);
    CopyWhileSomebodyPaints(bench);
}

TEST(DisplayStreams, LoseNothingWhenTheServerDoesNotAnswerForAWhile) {
    if (LacksServer())
        GTEST_SKIP();
    StreamBench bench(SmallServer(XServerOptions::Kind::Xvfb));
    Copier copier(bench.Open());
    copier.Take(bench, true);
    bench.Fill(0xFF0000, {30, 40, 50, 60});
    bench.CatchUp();
    const DisplayList displays = *bench.mirror.Displays();
    StreamMoment moment;
    moment.displays = &displays;
    moment.generationAfter = [] { return std::uint64_t{0}; };
    bench.server.Stop();
    bench.connection.SetDeadline(CmSteadyNow() + std::chrono::milliseconds(50));
    EXPECT_THROW(bench.streams.Take(*copier.reader, moment), Unanswered);
    EXPECT_THROW(bench.streams.Take(*copier.reader, moment), Unanswered);
    bench.server.Continue();
    bench.connection.SetDeadline(CmSteadyNow() + PATIENCE);
    ASSERT_NO_FATAL_FAILURE(copier.Take(bench, true));
    EXPECT_EQ(PixelsOf(*copier.last), bench.Screen());
    EXPECT_EQ(ArgbAt(*copier.last, 31, 41), 0xFFFF0000);
    EXPECT_EQ(bench.Take(copier.reader).outcome, PictureOutcome::Nothing);
}

} // namespace
} // namespace platform::x11
