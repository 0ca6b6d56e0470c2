// SPDX-License-Identifier: Apache-2.0
#include "tests/src/mac/share_capturer_context_mac_tools.h"
#include "tests/src/mac/window_walk_painter.h"
#include "tests/support/test_effort.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <string>
#include <vector>

/// The walk against a painter of single pixels, over random desktops. That the comparison would notice is
/// shown with painters that get a rule wrong.

namespace {

constexpr unsigned FIRST_SEED = 53'000;
constexpr int SCENES = 500;

platform::DisplayInfo DisplayOf(const SceneDisplay& scene) {
    const auto bounds = [](const TVLRect& rect) {
        return platform::CGRect{
            {static_cast<float>(rect.left), static_cast<float>(rect.top)},
            {static_cast<float>(rect.right - rect.left), static_cast<float>(rect.bottom - rect.top)}};
    };
    TVLRect visible = scene.rect;
    visible.top += scene.menuHeight;
    visible.left += scene.dock == DockPlace::Left ? scene.dockSize : 0;
    visible.right -= scene.dock == DockPlace::Right ? scene.dockSize : 0;
    visible.bottom -= scene.dock == DockPlace::Bottom ? scene.dockSize : 0;
    platform::DisplayInfo display = FakeDisplay(scene.id, bounds(scene.rect));
    display.visibleBounds = bounds(visible);
    return display;
}

void Put(const WalkScene& scene, CFakeWindowServer& server) {
    platform::DisplayList displays;
    for (const SceneDisplay& display : scene.displays)
        displays.push_back(DisplayOf(display));
    std::vector<platform::WindowInfo> frontFirst;
    for (auto window = scene.windows.rbegin(); window != scene.windows.rend(); ++window) {
        platform::WindowInfo info = FakeWindow(window->id, window->owner, window->frame, window->level);
        info.alpha = window->alpha;
        info.onScreen = window->isOnScreen;
        frontFirst.push_back(info);
    }
    server.SetDisplays(std::move(displays));
    server.SetWindows(std::move(frontFirst));
}

void Tell(const WalkScene& scene, ShareCapturerContext& context) {
    for (const SceneDisplay& display : scene.displays) {
        if (display.isShared)
            context.AddSharedDisplay(display.id);
    }
    for (const SceneApp& app : scene.apps) {
        if (app.listing == SceneListing::Shared)
            context.AddSharedApp(static_cast<unsigned>(app.pid));
        else if (app.listing == SceneListing::UnShared)
            context.AddUnSharedApp(static_cast<unsigned>(app.pid));
    }
    for (const SceneWindow& window : scene.windows) {
        if (window.listing == SceneListing::Shared)
            context.AddSharedWindow(window.id);
        else if (window.listing == SceneListing::UnShared)
            context.AddUnSharedWindow(window.id);
    }
    context.SetShareType(scene.shareType);
    context.m_bNoWindowBaseArea = !scene.isCutByWindows;
    context.m_bExcludeMenuBar = scene.excludesMenuBars;
    AppShareConfig::Instance()->m_nShareConfigFlags =
        scene.asksForDisplays ? 0u : static_cast<unsigned>(SHARE_CONFIG_FLAG_APP_DISPLAYS_AS_SET);
}

/// What the context has published.
WalkPicture Published(const WalkScene& scene, const CMacContextProbe& context) {
    WalkPicture picture(scene.universe);
    const auto add = [&](const Rects& rects, unsigned char bit) {
        for (const TVLRect& rect : rects) {
            EXPECT_TRUE(picture.plane.Holds(rect));
            if (picture.plane.Holds(rect))
                picture.plane.ForEach(rect, [bit](unsigned char& pixel, int, int) { pixel |= bit; });
        }
    };
    using Context = ShareCapturerContext;
    add(RegionGot(context, &Context::GetVisiableRegion), PIXEL_VISIBLE);
    add(RegionGot(context, &Context::GetOverlapRegion), PIXEL_OVERLAP);
    add(RegionGot(context, &Context::GetSharedWindowRegion), PIXEL_SHARED_WINDOW);
    add(RectsOf(context.m_rgnApplications), PIXEL_APPLICATION);
    add(RegionGot(context, &Context::GetInvisiableRegion), PIXEL_INVISIBLE);
    add(RegionGot(context, &Context::GetBackgroundInvisiableRegion), PIXEL_BACKGROUND);
    picture.captured = context.m_vCapturedWindows;
    picture.excluded = context.m_vCapturedExcludedWindows;
    return picture;
}

/// The displays that a second walk knows from the first.
std::vector<TVLRect> KnownAfterAWalk(const WalkScene& scene) {
    std::vector<TVLRect> known;
    for (const SceneDisplay& display : scene.displays) {
        if (scene.asksForDisplays || display.isShared)
            known.push_back(display.rect);
    }
    return known;
}

class WindowWalkOracle : public testing::Test {
protected:
    /// What differs between walk and painter, nothing when all is the same. Two walks, since the first one
    /// knows no menu bar.
    std::string Compare(unsigned seed, PainterFault fault = PainterFault::None) {
        const WalkScene scene = RandomScene::Make(seed);
        Put(scene, *server);
        CMacContextProbe context;
        Tell(scene, context);
        for (const bool isSecond : {false, true}) {
            EXPECT_EQ(context.UpdateShareCapturerContext(), -1);
            const std::vector<TVLRect> known = isSecond ? KnownAfterAWalk(scene) : std::vector<TVLRect>();
            const WalkPicture expected = WalkPainter(scene, fault).Paint(known);
            const WalkPicture published = Published(scene, context);
            if (!(published.plane == expected.plane))
                return "pixels of walk " + std::to_string(1 + (isSecond ? 1 : 0));
            if (published.captured != expected.captured)
                return "captured windows";
            if (published.excluded != expected.excluded)
                return "excluded windows";
            if (isSecond)
                Note(expected);
        }
        return "";
    }

    void Note(const WalkPicture& picture) {
        scenesWithOverlap += picture.plane.Count(PIXEL_OVERLAP) > 0 ? 1 : 0;
        scenesWithVisible += picture.plane.Count(PIXEL_VISIBLE) > 0 ? 1 : 0;
        scenesWithSkipped += picture.skipped > 0 ? 1 : 0;
        scenesWithMenuBars += picture.menuBars > 0 ? 1 : 0;
        scenesWithItems += picture.inMenuBars > 0 ? 1 : 0;
        scenesWithDocks += picture.dockPixels > 0 ? 1 : 0;
    }

    const CSettingsScope settings;
    const CFakeWindowServerScope server;
    int scenesWithOverlap = 0;
    int scenesWithVisible = 0;
    int scenesWithSkipped = 0;
    int scenesWithMenuBars = 0;
    int scenesWithItems = 0;
    int scenesWithDocks = 0;
};

} // namespace

TEST_F(WindowWalkOracle, AgreesWithThePainterOnEveryScene) {
    const int scenes = TestRounds(SCENES);
    for (int i = 0; i < scenes; ++i) {
        const unsigned seed = FIRST_SEED + static_cast<unsigned>(i);
        ASSERT_EQ(Compare(seed), "") << "scene of seed " << seed;
    }
    std::printf(
        "%d scenes from seed %u on: %d with something visible, %d with overlap, %d with skipped windows, "
        "%d with menu bars, %d with items in them, %d with a Dock over something\n",
        scenes, FIRST_SEED, scenesWithVisible, scenesWithOverlap, scenesWithSkipped, scenesWithMenuBars,
        scenesWithItems, scenesWithDocks);
    for (const int count : {scenesWithVisible, scenesWithOverlap, scenesWithSkipped, scenesWithMenuBars,
                            scenesWithItems, scenesWithDocks})
        EXPECT_GE(count, scenes / 20);
}

TEST_F(WindowWalkOracle, NoticesEachRuleThatIsWrong) {
    for (const PainterFault fault : EVERY_PAINTER_FAULT) {
        int scenes = 0;
        while (scenes < SCENES && Compare(FIRST_SEED + static_cast<unsigned>(scenes), fault).empty())
            ++scenes;
        EXPECT_LT(scenes, SCENES) << "fault " << static_cast<int>(fault) << " was never noticed";
        std::printf("fault %d noticed after %d scenes\n", static_cast<int>(fault), scenes);
    }
}
