// SPDX-License-Identifier: Apache-2.0
#include "platform/simulated/scene.h"
#include "tools/explanation_svg.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <fstream>
#include <iterator>
#include <memory>
#include <string>

/// Pictures of shares, kept beside the test. Run with SCREENSHARE_UPDATE_GOLDEN=1 it writes them anew; look
/// at each before it is kept.

namespace {

using platform::Scene;

constexpr int MENU = platform::SIMULATED_LEVEL_MAIN_MENU;
constexpr int DOCK = platform::SIMULATED_LEVEL_DOCK;
constexpr int DESKTOP = platform::SIMULATED_LEVEL_DESKTOP;

std::string ReadWhole(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
}

bool AsksForNewOnes() {
    const char* const update = std::getenv("SCREENSHARE_UPDATE_GOLDEN");
    return update != nullptr && std::string(update) == "1";
}

class ExplanationPictures : public testing::Test {
protected:
    void TearDown() override { platform::ReplaceWindowServer(nullptr); }

    static void ExpectPicture(const std::string& name, const Scene& scene, ShareRequest request) {
        platform::ReplaceWindowServer(scene.Serve());
        ASSERT_EQ(CompleteRequest(request), "");
        const std::string svg = ExplanationSvg(Explain(request));
        const std::string path = SCREENSHARE_GOLDEN_DIR "/" + name + ".svg";
        if (AsksForNewOnes()) {
            std::ofstream file(path, std::ios::binary);
            ASSERT_TRUE(file << svg << std::flush) << path;
        }
        EXPECT_TRUE(ReadWhole(path) == svg)
            << "the picture is not " << path << "; SCREENSHARE_UPDATE_GOLDEN=1 writes it anew";
    }
};

/// One display with what stands on every desktop.
Scene Desk() {
    Scene scene;
    scene.Display(0, 0, 200, 120).Named("Small Display").Reserving({0, 10, 0, 16});
    scene.App(100, "Desktop").Window(1).At(0, 0, 200, 120).Level(DESKTOP).Titled("Wallpaper");
    scene.App(101, "Dock").Window(2).At(40, 104, 120, 16).Level(DOCK).Titled("Dock");
    return scene;
}

} // namespace

TEST_F(ExplanationPictures, ShowWhatLiesOverASharedWindowAsOverlapButForSharedWindowsInFront) {
    ExpectPicture("shared_application",
                  Desk()
                      .App(500, "Editor")
                      .Window(10)
                      .At(20, 20, 100, 80)
                      .Titled("P: shared")
                      .App(600, "Chat")
                      .Window(11)
                      .At(70, 40, 90, 50)
                      .Titled("Q: a message")
                      .Window(12)
                      .Of(500)
                      .At(90, 60, 60, 55)
                      .Titled("R: shared"),
                  {.apps = {500}});
}

TEST_F(ExplanationPictures, ShowADesktopShareWithAnApplicationAndAWindowKeptOut) {
    ExpectPicture("desktop_with_exclusions",
                  Desk()
                      .App(500, "Editor")
                      .Window(10)
                      .At(10, 14, 90, 60)
                      .Titled("Chapter <One> & \"Two\"")
                      .App(600, "Chat")
                      .Window(11)
                      .At(60, 40, 90, 50)
                      .Titled("Private")
                      .App(700, "Notes")
                      .Window(12)
                      .At(120, 16, 70, 40)
                      .Titled("Gehört mir – ganz")
                      .Window(13)
                      .At(100, 70, 60, 30)
                      .Titled("Half there")
                      .Alpha(0.5F),
                  {.excludedApps = {600}, .excludedWindows = {12}});
}

TEST_F(ExplanationPictures, ShowAMenuBarAndWhatLiesInItKeptOut) {
    ExpectPicture("menu_bar",
                  Desk()
                      .App(500, "Editor")
                      .Window(10)
                      .At(0, 0, 150, 90)
                      .Titled("Shared")
                      .Window(11)
                      .At(0, 0, 200, 10)
                      .Level(MENU)
                      .Titled("Menu bar")
                      .Window(12)
                      .At(120, 1, 20, 8)
                      .Level(MENU + 1)
                      .Titled("Clock"),
                  {.apps = {500}, .excludesMenuBars = true});
}

TEST_F(ExplanationPictures, ShowWindowsOverTwoMonitorsAndThoseThatHideNothing) {
    Scene scene;
    scene.Display(0, 0, 200, 120).Named("Left").Scale(2);
    scene.Display(200, 20, 120, 90).Named("Right");
    ExpectPicture("windows_over_two_monitors",
                  scene.App(500, "Editor")
                      .Window(10)
                      .At(120, 30, 140, 60)
                      .Titled("Across")
                      .Window(11)
                      .At(20, 10, 80, 50)
                      .Titled("Not asked for")
                      .App(600, "Overlay")
                      .Window(12)
                      .At(140, 20, 60, 60)
                      .Titled("Glass")
                      .Alpha(0)
                      .Window(13)
                      .At(230, 40, 60, 60)
                      .Titled("Solid")
                      .App(700, "Vault")
                      .Window(14)
                      .At(130, 60, 40, 40)
                      .Titled("Secret")
                      .Unshared(),
                  {.windows = {10, 14}});
}

TEST_F(ExplanationPictures, ShowADesktopWithoutWindows) {
    ExpectPicture("no_window", Scene().Display(0, 0, 200, 120).Named("Empty"), {});
}
