// SPDX-License-Identifier: Apache-2.0
#include "platform/simulated/scene.h"

#include "platform/core_graphics.h"
#include "tests/platform/conformance_checks.h"
#include "tests/support/threads.h"
#include "util/cm_clock.h"
#include "util/cm_trace.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <memory>
#include <string>
#include <vector>

namespace {

using namespace platform;
using namespace std::chrono_literals;

std::vector<CGWindowID> IdsOf(const SimulatedDesktop& desktop) {
    std::vector<CGWindowID> ids;
    for (const SimulatedWindow& window : desktop.windows)
        ids.push_back(window.info.id);
    return ids;
}

/// What a reader of the main display sees now.
std::vector<std::uint32_t> Seen(SimulatedWindowServer& server) {
    const auto opened = server.OpenDisplayStream({.display = 1, .framesPerSecond = 60, .withPointer = true});
    const PicturePtr picture = opened.stream->TakeNewest(CmSteadyNow() + 1s).picture;
    return picture != nullptr ? PixelsOf(*picture) : std::vector<std::uint32_t>();
}

} // namespace

TEST(Scene, SaysEachWordOfTheLastThingBeforeIt) {
    const SimulatedDesktop desktop = Scene()
                                         .Display(0, 0, 200, 120)
                                         .Scale(2)
                                         .Named("Left")
                                         .Reserving({1, 2, 3, 4})
                                         .Display(200, 0, 100, 80)
                                         .DisplayId(9)
                                         .App(100, "Editor")
                                         .FileName("ed")
                                         .App(200, "Agent")
                                         .BackgroundOnly()
                                         .Kind(ApplicationKind::Other)
                                         .Window(1)
                                         .Of(100)
                                         .At(10, 20, 30, 40)
                                         .Titled("Text")
                                         .Alpha(0.5F)
                                         .Window(2)
                                         .Unshared()
                                         .OffScreen()
                                         .Pointer(3, 4)
                                         .Build();
    ASSERT_EQ(desktop.displays.size(), 2u);
    EXPECT_EQ(desktop.displays[0].id, 1u);
    EXPECT_EQ(desktop.displays[0].scale, 2.0F);
    EXPECT_EQ(desktop.displays[0].name, "Left");
    EXPECT_EQ(desktop.displays[0].reserved.bottom, 4.0F);
    EXPECT_EQ(desktop.displays[1].id, 9u);
    EXPECT_EQ(desktop.displays[1].scale, 1.0F);
    ASSERT_EQ(desktop.applications.size(), 2u);
    EXPECT_EQ(desktop.applications[0].fileName, "ed");
    EXPECT_FALSE(desktop.applications[0].backgroundOnly);
    EXPECT_EQ(desktop.applications[1].fileName, "Agent");
    EXPECT_TRUE(desktop.applications[1].backgroundOnly);
    EXPECT_EQ(desktop.applications[1].kind, ApplicationKind::Other);
    ASSERT_EQ(IdsOf(desktop), (std::vector<CGWindowID>{2, 1}));
    const WindowInfo& back = desktop.windows[1].info;
    EXPECT_EQ(back.owner, 100);
    EXPECT_EQ(back.frame, (CGRect{{10, 20}, {30, 40}}));
    EXPECT_EQ(back.title, "Text");
    EXPECT_EQ(back.alpha, 0.5F);
    EXPECT_TRUE(back.onScreen);
    EXPECT_EQ(desktop.windows[0].info.owner, 200) << "the last application's";
    EXPECT_EQ(desktop.windows[0].info.sharing, SharingState::None);
    EXPECT_FALSE(desktop.windows[0].info.onScreen);
    EXPECT_EQ(desktop.pointer, (CGPoint{3, 4}));
}

TEST(Scene, StacksWindowsByLevelAndThenByOrder) {
    Scene scene;
    scene.Window(1).Level(5).Window(2).Window(3).Level(5).Window(4).Level(-1).Window(5);
    EXPECT_EQ(IdsOf(scene.Build()), (std::vector<CGWindowID>{3, 1, 5, 2, 4}));
    EXPECT_EQ(IdsOf(scene.StackedAsNamed().Build()), (std::vector<CGWindowID>{5, 4, 3, 2, 1}));
}

TEST(Scene, ReportsAWordThatIsSaidOfNothing) {
    const unsigned before = cm_assertion_count();
    Scene().Alpha(0.5F);
    Scene().Scale(2);
    Scene().BackgroundOnly();
    EXPECT_EQ(cm_assertion_count(), before + 3);
    Scene().Window(1).Alpha(0.5F);
    EXPECT_EQ(cm_assertion_count(), before + 3);
}

TEST(Scene, HasTheLevelsOfTheUpperFloor) {
    EXPECT_EQ(SIMULATED_LEVEL_DESKTOP, CGWindowLevelForKey(kCGDesktopWindowLevelKey));
    EXPECT_EQ(SIMULATED_LEVEL_DOCK, CGWindowLevelForKey(kCGDockWindowLevelKey));
    EXPECT_EQ(SIMULATED_LEVEL_MAIN_MENU, CGWindowLevelForKey(kCGMainMenuWindowLevelKey));
}

TEST(DefaultScene, IsADesktopWithSomethingToShareAndSomethingToKeepOut) {
    SimulatedWindowServer server(DefaultScene());
    EXPECT_TRUE(IsLawful(*server.GetDisplays()));
    EXPECT_EQ(server.GetDisplays()->size(), 2u);
    EXPECT_TRUE(IsLawful(*server.GetWindows()));
    const auto windows = server.GetWindows();
    const auto count = [&](auto choice) {
        return std::count_if(windows->Windows().begin(), windows->Windows().end(), choice);
    };
    EXPECT_GE(count([](const WindowInfo& each) { return each.level == 0; }), 3);
    EXPECT_EQ(count([](const WindowInfo& each) { return each.sharing == SharingState::None; }), 1);
    EXPECT_EQ(count([](const WindowInfo& each) { return each.level == SIMULATED_LEVEL_DOCK; }), 1);
    EXPECT_NE(server.GetCursor(), nullptr);
    EXPECT_EQ(server.GetCursor()->representations.size(), 2u);
}

TEST(DefaultScene, MovesWithTheClockAndWithNothingElse) {
    CManualClockScope clock;
    SimulatedWindowServer one(DefaultScene());
    SimulatedWindowServer other(DefaultScene());
    const auto first = Seen(one);
    ASSERT_FALSE(first.empty());
    EXPECT_EQ(Seen(one), first);
    const std::uint64_t generation = one.GetWindows()->Generation();
    clock->Advance(1s);
    const auto second = Seen(one);
    EXPECT_NE(second, first);
    EXPECT_EQ(Seen(other), second) << "the same script gives the same pictures";
    EXPECT_EQ(one.GetWindows()->Generation(), generation) << "no window has moved";
    clock->Advance(1s);
    EXPECT_NE(Seen(one), second);
}

TEST(DefaultScene, NeverRepeatsItsPictureFromOneFrameToTheNext) {
    CManualClockScope clock;
    SimulatedWindowServer server(DefaultScene());
    WindowPictureRequest request;
    request.windows = {8};
    request.rect = server.GetWindows()->Find(8)->frame;
    std::vector<std::uint32_t> before;
    for (int frame = 0; frame < 30; ++frame) {
        request.deadline = CmSteadyNow() + 1s;
        const auto picture = server.TakeWindowPicture(request).picture;
        ASSERT_NE(picture, nullptr);
        const std::vector<std::uint32_t> now = PixelsOf(*picture->layers.at(0).picture);
        EXPECT_NE(now, before) << frame;
        before = now;
        clock->Advance(33ms);
    }
}
