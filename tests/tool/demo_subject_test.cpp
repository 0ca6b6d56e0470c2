// SPDX-License-Identifier: Apache-2.0
#include "tools/demo_subject.h"

#include "tests/src/mac/backend_tools.h"
#include "tools/demo_pixels.h"
#include "tools/demo_words.h"

#include <gtest/gtest.h>

#include <unistd.h>

#include <string>
#include <vector>

using namespace platform;

namespace {

using Ids = std::vector<unsigned>;

constexpr int PANEL_LEVEL = SIMULATED_LEVEL_DOCK;

/// Windows on two displays, to which cases add what is in front.
Scene TwoDisplays() {
    return Scene()
        .Display(0, 0, 200, 120)
        .Display(200, 0, 200, 120)
        .App(100, "Editor")
        .Window(1)
        .At(10, 10, 80, 60)
        .Titled("Page")
        .Window(2)
        .At(20, 20, 80, 60)
        .Titled("Notes");
}

Ids KeptOutOf(const Scene& scene, const DemoOptions& options = {}) {
    const CServedScene desktop(scene);
    DemoSubject subject;
    EXPECT_FALSE(ChooseOnDesktop(options, subject).has_value());
    EXPECT_EQ(subject.request.monitor, 1u);
    EXPECT_EQ(subject.monitors.size(), 1u);
    EXPECT_EQ(subject.keptOut.empty(), subject.request.excludedWindows.empty());
    return subject.request.excludedWindows;
}

DemoFindings FindingsOf(std::int64_t secretOnScreen, std::int64_t secretInPictures) {
    const CServedScene desktop(TwoDisplays());
    DemoFindings findings;
    findings.screen = ScreenPicture(ListMonitors());
    findings.screenTally = {100, secretOnScreen, false};
    for (const SCREEN_CAPTURER_TYPE mode : {SCREEN_CAPTURER_TYPE_DEFAULT, SCREEN_CAPTURER_TYPE_CGS_GCD})
        findings.shots.push_back({{mode, findings.screen, 30, ""}, {100, 0, false}});
    findings.shots.back().tally.secret = secretInPictures;
    return findings;
}

DemoSubject SubjectOfScene() {
    DemoSubject subject;
    subject.isScene = true;
    subject.keptOut = "the window";
    return subject;
}

} // namespace

TEST(DemoSubject, KeepsTheFrontmostWindowOut) {
    EXPECT_EQ(KeptOutOf(TwoDisplays()), (Ids{2}));
}

TEST(DemoSubject, KeepsTheWindowOutThatIsNamed) {
    DemoOptions options;
    options.excludedWindow = 1;
    EXPECT_EQ(KeptOutOf(TwoDisplays(), options), (Ids{1}));
}

TEST(DemoSubject, PassesOverWhatIsNoOrdinaryWindowOfTheMainMonitor) {
    Scene scene = TwoDisplays();
    scene.Window(3).At(0, 100, 200, 20).Level(PANEL_LEVEL);
    scene.Window(4).At(0, 0, 200, 120).Alpha(0);
    scene.Window(5).At(210, 10, 80, 60).Titled("On the other monitor");
    scene.Window(6).At(30, 30, 80, 60).OffScreen();
    EXPECT_EQ(KeptOutOf(scene), (Ids{2}));
}

TEST(DemoSubject, PassesOverWhatItWasStartedFrom) {
    Scene scene = TwoDisplays();
    scene.App(getpid(), "This one").Window(3).At(0, 0, 50, 50);
    scene.App(getppid(), "Terminal").Window(4).At(0, 0, 50, 50);
    EXPECT_EQ(KeptOutOf(scene), (Ids{2}));
    EXPECT_EQ(KeptOutOf(Scene().Display(0, 0, 200, 120).App(getppid(), "Terminal").Window(4).At(0, 0, 9, 9)),
              Ids{});
}

TEST(DemoSubject, IsRefusedWhereTheNamedWindowIsNotThere) {
    const CServedScene desktop(TwoDisplays());
    DemoOptions options;
    options.excludedWindow = 9;
    DemoSubject subject;
    const WriteResult failure = ChooseOnDesktop(options, subject);
    ASSERT_TRUE(failure.has_value());
    EXPECT_EQ(failure->code, EXIT_CODE_FAILED);
    EXPECT_EQ(failure->text, "there is no window 9; there are: 2, 1");
}

TEST(DemoScreen, ShowsAllMonitorsWhereTheyStand) {
    const CServedScene desktop(
        Scene().Display(0, 0, 60, 40).Background(0x0000FF).Display(60, 10, 30, 20).Background(0xC00000));
    const CGImageRef both = ScreenPicture(ListMonitors());
    ASSERT_NE(both, nullptr);
    EXPECT_EQ(both->width, 90);
    EXPECT_EQ(both->height, 40);
    const PixelTally tally = TallyPixels(both.get());
    EXPECT_EQ(tally.pixels, 90 * 40);
    EXPECT_EQ(tally.secret, 30 * 20) << "red is what the scene's secret is known by";
    EXPECT_FALSE(tally.isPlain);
    const CGImageRef main = ScreenPicture({ListMonitors().front()});
    ASSERT_NE(main, nullptr);
    EXPECT_EQ(TallyPixels(main.get()).secret, 0);
    EXPECT_TRUE(TallyPixels(main.get()).isPlain);
}

TEST(DemoScreen, HasNoPictureWithoutStreams) {
    const CServedScene desktop(TwoDisplays());
    desktop->Lose();
    EXPECT_EQ(ScreenPicture(ListMonitors()), nullptr);
    EXPECT_EQ(TallyPixels(nullptr).pixels, 0);
}

TEST(DemoProblem, IsAnySecretPixelInAPicture) {
    EXPECT_EQ(DemoProblem(SubjectOfScene(), FindingsOf(50, 0)), "");
    EXPECT_EQ(DemoProblem(SubjectOfScene(), FindingsOf(50, 1)),
              "the window shows in the picture of mode queued, in 1 pixels");
}

TEST(DemoProblem, TakesThePlaceOfWhatThePicturesShow) {
    const std::vector<std::string> good = DemoLessons(SubjectOfScene(), FindingsOf(50, 0));
    const std::vector<std::string> bad = DemoLessons(SubjectOfScene(), FindingsOf(50, 1));
    ASSERT_EQ(good.size(), 4u);
    EXPECT_EQ(good[3],
              "Counted: 50 of its pixels are on the screen; among the 200 that others see there are 0.");
    ASSERT_EQ(bad.size(), 2u);
    EXPECT_EQ(bad[1], "Not as it should be: the window shows in the picture of mode queued, in 1 pixels.");
}

TEST(DemoProblem, IsASceneThatProvesNothing) {
    EXPECT_EQ(DemoProblem(SubjectOfScene(), FindingsOf(0, 0)),
              "the window is not on the screen, so the pictures prove nothing");
    DemoFindings findings = FindingsOf(50, 0);
    findings.shots.front().tally.isPlain = true;
    EXPECT_EQ(DemoProblem(SubjectOfScene(), findings), "the picture of mode default shows nothing");
    findings.shots.front().shot.picture = nullptr;
    EXPECT_EQ(DemoProblem(SubjectOfScene(), findings), "mode default gave no picture");
}

TEST(DemoProblem, IsADesktopWithoutAnyPicture) {
    DemoFindings findings = FindingsOf(0, 0);
    findings.shots.front().shot.picture = nullptr;
    EXPECT_EQ(DemoProblem({}, findings), "") << "one mode is enough";
    findings.shots.back().shot.picture = nullptr;
    EXPECT_NE(DemoProblem({}, findings), "");
}
