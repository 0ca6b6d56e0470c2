// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/display_mirror.h"
#include "tests/platform/conformance_checks.h"
#include "tests/support/test_effort.h"
#include "tests/support/threads.h"
#include "tests/x11/component_bench.h"
#include "tests/x11/x11_outputs.h"

#include <gtest/gtest.h>

#include <chrono>
#include <cstring>
#include <iostream>
#include <map>
#include <random>

namespace platform::x11 {
namespace {

using Kind = XServerOptions::Kind;

std::vector<std::uint8_t> Edid() {
    std::vector<std::uint8_t> edid(128);
    std::fill(edid.begin() + 1, edid.begin() + 7, std::uint8_t{0xFF});
    return edid;
}

/// `text` may be shorter than the 13 bytes that there are; the rest is 0.
void Describe(std::vector<std::uint8_t>& edid, std::size_t descriptor, std::uint8_t tag,
              const std::string& text) {
    const std::size_t place = 54 + descriptor * 18;
    edid[place + 3] = tag;
    std::memcpy(&edid[place + 5], text.data(), std::min<std::size_t>(text.size(), 13));
}

TEST(ProductNameFromEdid, TakesTheNameAndNotWhatPadsIt) {
    std::vector<std::uint8_t> edid = Edid();
    Describe(edid, 1, 0xFE, "free text\n   ");
    Describe(edid, 3, 0xFC, "  Model 27Q\n x");
    EXPECT_EQ(ProductNameFromEdid(edid), "Model 27Q");
}

TEST(ProductNameFromEdid, TakesTheFreeTextWithoutAName) {
    std::vector<std::uint8_t> edid = Edid();
    Describe(edid, 0, 0xFC, "\n");
    Describe(edid, 2, 0xFE, "PANEL 156");
    EXPECT_EQ(ProductNameFromEdid(edid), "PANEL 156");
}

TEST(ProductNameFromEdid, IsEmptyForWhatIsNoEdid) {
    std::vector<std::uint8_t> edid = Edid();
    Describe(edid, 0, 0xFC, "Model");
    EXPECT_EQ(ProductNameFromEdid({}), "");
    EXPECT_EQ(ProductNameFromEdid(std::span(edid).first(127)), "");
    edid[0] = 1;
    EXPECT_EQ(ProductNameFromEdid(edid), "");
}

TEST(ProductNameFromEdid, GivesNothingButPrintableCharactersOfAnything) {
    const unsigned seed = std::random_device()();
    std::mt19937 random(seed);
    const int count = 20000 * TestEffort();
    int named = 0;
    for (int i = 0; i < count; ++i) {
        std::vector<std::uint8_t> edid = Edid();
        edid.resize(random() % 300);
        for (std::size_t k = 8; k < edid.size(); ++k)
            edid[k] = static_cast<std::uint8_t>(random());
        for (std::size_t k = 54; k + 18 <= std::min<std::size_t>(edid.size(), 126); k += 18) {
            std::fill_n(edid.begin() + static_cast<std::ptrdiff_t>(k), 3, std::uint8_t{0});
            edid[k + 3] = random() % 2 == 0 ? 0xFC : 0xFE;
        }
        const std::string name = ProductNameFromEdid(edid);
        named += name.empty() ? 0 : 1;
        ASSERT_LE(name.size(), 13U) << "seed " << seed;
        ASSERT_TRUE(std::all_of(name.begin(), name.end(), [](char c) { return c >= ' ' && c < 0x7F; }))
            << "seed " << seed;
    }
    std::cout << count << " EDIDs, " << named << " with a name, seed " << seed << "\n";
    EXPECT_GT(named, count / 20);
}

/// A mirror with its own events.
class MirrorBench : public ComponentBench {
public:
    explicit MirrorBench(const XServerOptions& options)
        : ComponentBench(options),
          outputs(server),
          mirror(connection, memory) {
        mirror.Select();
        mirror.Read();
    }

    const DisplayList& Displays() const { return *mirror.Displays(); }

    /// Takes events in until there are so many displays, all of them lawful.
    bool ComesTo(const std::function<bool(const DisplayList& displays)>& condition) {
        return ComesTrue([&] {
            Drain([this](const xcb_generic_event_t& event) { mirror.OnEvent(event); });
            mirror.DoDue();
            EXPECT_TRUE(IsLawful(Displays()));
            return condition(Displays());
        });
    }
    bool ComesToCount(std::size_t count) {
        return ComesTo([count](const DisplayList& displays) { return displays.size() == count; });
    }
    bool Xrandr(const std::vector<std::string>& arguments) {
        CChildProcess::Plan plan;
        plan.command = {"xrandr", "-display", server.Display()};
        plan.command.insert(plan.command.end(), arguments.begin(), arguments.end());
        CChildProcess process(plan);
        return process.WaitForEnd(30000);
    }

    X11Outputs outputs;
    DisplayMirror mirror;
};

bool Lacks(Kind kind) {
    std::vector<std::string> programs = XServer::ProgramsOf(kind);
    programs.emplace_back("xrandr");
    const auto missing = MissingProgram(programs);
    if (missing)
        std::cout << *missing << "\n";
    return missing.has_value();
}

TEST(DisplayMirror, GivesAMonitorItsIdAgainWhenItIsPluggedInAgain) {
    if (Lacks(Kind::Xorg))
        GTEST_SKIP();
    MirrorBench bench(SmallServer(Kind::Xorg));
    ASSERT_TRUE(bench.ComesToCount(1));
    const CGDirectDisplayID first = bench.Displays()[0].id;
    const std::optional<std::string> added = bench.outputs.Add(800, 600);
    ASSERT_TRUE(added);
    ASSERT_TRUE(bench.ComesToCount(2));
    const DisplayInfo second = bench.Displays()[1];
    EXPECT_EQ(second.bounds, (CGRect{{640, 0}, {800, 600}}));
    EXPECT_EQ(second.productName, *added);
    EXPECT_EQ(bench.Displays()[0].id, first);

    ASSERT_TRUE(bench.outputs.SetOn(*added, false));
    ASSERT_TRUE(bench.ComesToCount(1));
    EXPECT_EQ(bench.Displays()[0].id, first);
    ASSERT_TRUE(bench.outputs.SetOn(*added, true));
    ASSERT_TRUE(bench.ComesToCount(2));
    EXPECT_EQ(bench.Displays()[1].id, second.id);
}

TEST(DisplayMirror, PutsTheOriginWhereTheMainDisplayIs) {
    if (Lacks(Kind::Xorg))
        GTEST_SKIP();
    MirrorBench bench(SmallServer(Kind::Xorg));
    const CGDirectDisplayID first = bench.Displays().at(0).id;
    const std::optional<std::string> added = bench.outputs.Add(800, 600);
    ASSERT_TRUE(added);
    ASSERT_TRUE(bench.ComesToCount(2));
    ASSERT_TRUE(bench.outputs.MakePrimary(*added));
    ASSERT_TRUE(bench.ComesTo([first](const DisplayList& all) { return all[0].id != first; }));
    EXPECT_EQ(bench.Displays()[0].bounds, (CGRect{{0, 0}, {800, 600}}));
    EXPECT_EQ(bench.Displays()[1].bounds, (CGRect{{-640, 0}, {640, 480}}));
    EXPECT_EQ(bench.mirror.Origin(), (CGPoint{640, 0}));
    EXPECT_EQ(bench.mirror.RootWidth(), 1440);
}

TEST(DisplayMirror, ListsNothingWhenAllAreOff) {
    if (Lacks(Kind::Xorg))
        GTEST_SKIP();
    MirrorBench bench(SmallServer(Kind::Xorg));
    ASSERT_TRUE(bench.ComesToCount(1));
    const CGDirectDisplayID first = bench.Displays()[0].id;
    ASSERT_TRUE(bench.Xrandr({"--output", X11Outputs::First(), "--off"}));
    ASSERT_TRUE(bench.ComesToCount(0));
    EXPECT_EQ(bench.mirror.Origin(), CGPoint());
    ASSERT_TRUE(bench.Xrandr({"--output", X11Outputs::First(), "--auto"}));
    ASSERT_TRUE(bench.ComesToCount(1));
    EXPECT_EQ(bench.Displays()[0].id, first);
}

TEST(DisplayMirror, TakesMirroredMonitorsForOne) {
    if (Lacks(Kind::Xorg))
        GTEST_SKIP();
    MirrorBench bench(SmallServer(Kind::Xorg));
    const CGDirectDisplayID first = bench.Displays().at(0).id;
    const std::optional<std::string> added = bench.outputs.Add(640, 480);
    ASSERT_TRUE(added);
    ASSERT_TRUE(bench.ComesToCount(2));
    ASSERT_TRUE(bench.Xrandr({"--output", *added, "--same-as", X11Outputs::First()}));
    ASSERT_TRUE(bench.ComesToCount(1));
    EXPECT_EQ(bench.Displays()[0].id, first);
}

TEST(DisplayMirror, HearsOfMonitorsThatOnlyTheRootTellsOf) {
    if (Lacks(Kind::Xvfb))
        GTEST_SKIP();
    MirrorBench bench(SmallServer(Kind::Xvfb));
    ASSERT_TRUE(bench.ComesToCount(1));
    ASSERT_TRUE(bench.Xrandr({"--setmonitor", "left", "120/30x240/60+0+0", "screen"}));
    ASSERT_TRUE(bench.Xrandr({"--setmonitor", "right", "200/30x240/60+120+0", "none"}));
    ASSERT_TRUE(bench.ComesToCount(2));
    EXPECT_EQ(bench.Displays()[0].bounds, (CGRect{{0, 0}, {120, 240}}));
    EXPECT_EQ(bench.Displays()[1].bounds, (CGRect{{120, 0}, {200, 240}}));
    EXPECT_EQ(bench.Displays()[1].productName, "right");
}

TEST(DisplayMirror, CutsMonitorsThatReachBeyondTheRoot) {
    if (Lacks(Kind::Xvfb))
        GTEST_SKIP();
    MirrorBench bench(SmallServer(Kind::Xvfb));
    ASSERT_TRUE(bench.Xrandr({"--setmonitor", "large", "9000/30x9000/60+100+50", "screen"}));
    ASSERT_TRUE(bench.ComesTo([](const DisplayList& displays) {
        return !displays.empty() && displays[0].bounds.size == CGSize{220, 190};
    }));
    EXPECT_EQ(bench.mirror.Origin(), (CGPoint{100, 50}));
    ASSERT_TRUE(bench.Xrandr({"--setmonitor", "elsewhere", "100/30x100/60+4000+4000", "none"}));
    EXPECT_FALSE(bench.Displays().empty());
}

TEST(DisplayMirror, TakesReservedEdgesFromTheirDisplayOnly) {
    if (Lacks(Kind::Xvfb))
        GTEST_SKIP();
    MirrorBench bench(SmallServer(Kind::Xvfb));
    ASSERT_TRUE(bench.Xrandr({"--setmonitor", "left", "120/30x240/60+0+0", "screen"}));
    ASSERT_TRUE(bench.Xrandr({"--setmonitor", "right", "200/30x240/60+120+0", "none"}));
    ASSERT_TRUE(bench.ComesToCount(2));
    Strut strut;
    strut.size.top = 20;
    strut.topStart = 120;
    strut.topEnd = 319;
    EXPECT_TRUE(bench.mirror.SetStruts(std::span(&strut, 1)));
    EXPECT_FALSE(bench.mirror.SetStruts(std::span(&strut, 1)));
    EXPECT_EQ(bench.Displays()[0].visibleBounds, bench.Displays()[0].bounds);
    EXPECT_EQ(bench.Displays()[1].visibleBounds, (CGRect{{120, 20}, {200, 220}}));
    EXPECT_TRUE(bench.mirror.SetStruts({}));
}

TEST(DisplayMirror, WaitsUntilTheLayoutHasSettledButNotForEver) {
    if (Lacks(Kind::Xvfb))
        GTEST_SKIP();
    MirrorBench bench(SmallServer(Kind::Xvfb));
    ASSERT_TRUE(bench.Xrandr({"--setmonitor", "left", "120/30x240/60+0+0", "screen"}));
    bench.Drain([](const xcb_generic_event_t&) {});
    CManualClockScope clock;
    xcb_configure_notify_event_t told{};
    told.response_type = XCB_CONFIGURE_NOTIFY;
    told.window = bench.connection.Root();
    const auto& event = reinterpret_cast<const xcb_generic_event_t&>(told);
    const std::chrono::nanoseconds start = CmSteadyNow();
    int events = 0;
    while (CmSteadyNow() - start < DisplayMirror::LONGEST_SETTLE_TIME) {
        ASSERT_TRUE(bench.mirror.OnEvent(event));
        ASSERT_FALSE(bench.mirror.DoDue());
        ASSERT_GT(bench.mirror.NextDue().value(), CmSteadyNow());
        clock->Advance(DisplayMirror::SETTLE_TIME / 2);
        ++events;
    }
    EXPECT_GT(events, 10);
    EXPECT_TRUE(bench.mirror.DoDue());
    EXPECT_FALSE(bench.mirror.NextDue());
    EXPECT_EQ(bench.Displays().at(0).bounds.size, (CGSize{120, 240}));
}

TEST(DisplayMirror, LeavesEventsOfOtherWindowsAlone) {
    if (Lacks(Kind::Xvfb))
        GTEST_SKIP();
    MirrorBench bench(SmallServer(Kind::Xvfb));
    xcb_configure_notify_event_t event{};
    event.response_type = XCB_CONFIGURE_NOTIFY;
    event.window = bench.connection.Root() + 1;
    EXPECT_FALSE(bench.mirror.OnEvent(reinterpret_cast<const xcb_generic_event_t&>(event)));
    EXPECT_FALSE(bench.mirror.NextDue());
}

} // namespace
} // namespace platform::x11
