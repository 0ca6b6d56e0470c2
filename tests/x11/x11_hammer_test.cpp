// SPDX-License-Identifier: Apache-2.0
#include "tests/support/test_effort.h"
#include "tests/x11/x11_fixture.h"

#include <chrono>
#include <cstdlib>
#include <iostream>

/// Somebody maps, raises, moves, resizes and closes red windows over and beside a green one that is shared,
/// which itself is resized, unmapped and mapped all the while, and takes its time to paint. Whatever picture
/// is taken of the green one, nothing in it is red.

namespace {

using namespace platform;
using Manager = X11DeskOptions::Manager;

constexpr unsigned SEED = 20250611;

class X11Hammer : public X11Test {
protected:
    struct Tally {
        int pictures = 0;
        int whole = 0;      ///< Of them, those that show the whole window green.
        int partial = 0;    ///< Of them, those from which something was withheld.
        int withheld = 0;   ///< Attempts that gave nothing, for nothing was known to be the window's own,
        int stale = 0;      ///< since the stack didn't hold still,
        int gone = 0;       ///< since there was no such window,
        int unanswered = 0; ///< since the server has not answered for a second, on a machine that is busy,
        int failed = 0;     ///< for any other reason.
        int withRed = 0;    ///< Pictures with a red pixel in them.
        int screens = 0;    ///< Looks at the screen where the window is,
        int screensRed = 0; ///< and those that show something red there.
    };

    /// How long the shared window is left alone: longer than it takes to trust it again.
    static constexpr std::chrono::milliseconds BEAT{100};

    /// Fewer pictures prove nothing.
    static constexpr int FEWEST = 20;

    static std::chrono::seconds Duration() { return std::chrono::seconds(TestEffort() > 1 ? 60 : 2); }

    /// The shared window without a background, so that what it gains by growing, or by being mapped, is
    /// somebody else's until its client has painted.
    void BeginHammering(const X11DeskOptions& options) {
        m_shared = Add("shared", "150 120 200 150 00ff00 none slow=25");
        ASSERT_NE(TakeWhenShown(m_shared, GREEN), nullptr);
        const auto hammering = Desk().StartApplication("Hammer");
        ASSERT_TRUE(hammering);
        m_hammer = *hammering;
        // One that holds still, so that it has time to be shown where it is asked for.
        ASSERT_TRUE(Desk().Application(m_hammer)->Create("still", "400 300 50 50 ff0000"));
        m_screen.emplace(Desk().Rig().Display());
        std::cout << "window manager: " << (options.manager != Manager::None)
                  << ", compositor: " << options.picom << ", seed: " << SEED << "\n";
        ASSERT_TRUE(
            Desk().Application(m_hammer)->Tell("hammer 200 150 300 250 ff0000 " + std::to_string(SEED)));
    }

    void EndHammering() {
        EXPECT_TRUE(Desk().Application(m_hammer)->Tell("calm"));
        EXPECT_TRUE(Application().Tell("map shared"));
        const auto picture = TakeWhenShown(m_shared, GREEN);
        EXPECT_NE(picture, nullptr) << "afterwards it is to be seen again";
    }

    void DisturbShared(int round) {
        static const char* const DISTURBANCES[] = {"place shared 150 120 260 210", "unmap shared",
                                                   "map shared", "place shared 170 100 180 120"};
        EXPECT_TRUE(Application().Tell(DISTURBANCES[round % 4]));
    }

    /// Takes pictures for the duration, and then until they are enough, which a busy machine may have to be
    /// waited for. `alsoSecrets`: asks for the red windows as well.
    template <class Condition>
    Tally TakePictures(bool alsoSecrets, Condition isEnough) {
        Tally tally;
        const auto start = std::chrono::steady_clock::now();
        auto now = start;
        const auto goesOn = [&] {
            return now < start + Duration() || (!isEnough(tally) && now < start + PATIENCE);
        };
        for (int beat = 0; goesOn(); now = std::chrono::steady_clock::now()) {
            if (now >= start + BEAT * beat) {
                DisturbShared(beat++);
                LookAtScreen(tally);
            }
            std::vector<CGWindowID> windows{m_shared};
            if (alsoSecrets)
                AppendSecrets(windows);
            Judge(Take(windows), tally);
        }
        Print(tally);
        return tally;
    }

private:
    static void Print(const Tally& tally) {
        std::cout << "pictures: " << tally.pictures << ", whole: " << tally.whole
                  << ", partly withheld: " << tally.partial << ", with red: " << tally.withRed
                  << "; none, since withheld: " << tally.withheld
                  << ", since the stack moved: " << tally.stale
                  << ", since there was no window: " << tally.gone
                  << ", since nobody answered: " << tally.unanswered
                  << ", since they failed: " << tally.failed << "; looks at the screen: " << tally.screens
                  << ", with red: " << tally.screensRed << "\n";
    }

    void AppendSecrets(std::vector<CGWindowID>& windows) {
        const auto snapshot = Server().GetWindows();
        for (const WindowInfo& window : snapshot->Windows()) {
            if (window.owner == m_hammer)
                windows.push_back(window.id);
        }
    }

    static void Judge(const WindowPictureResult& result, Tally& tally) {
        const bool isOk = result.outcome == PictureOutcome::Ok;
        const bool isStale = result.outcome == PictureOutcome::Stale;
        tally.stale += isStale ? 1 : 0;
        const bool isGone = result.outcome == PictureOutcome::Gone;
        tally.gone += isGone ? 1 : 0;
        const bool isUnanswered = result.outcome == PictureOutcome::Lost;
        tally.unanswered += isUnanswered ? 1 : 0;
        tally.failed += isOk || isStale || isGone || isUnanswered ? 0 : 1;
        tally.withheld += isOk && result.picture->layers.empty() ? 1 : 0;
        if (result.picture == nullptr || result.picture->layers.empty())
            return;
        ++tally.pictures;
        bool red = false;
        bool whole = true;
        for (const PictureLayer& layer : result.picture->layers) {
            const Picture& picture = *layer.picture;
            for (int y = 0; y < picture.height; ++y) {
                for (int x = 0; x < picture.width; ++x) {
                    const std::uint32_t pixel = ArgbAt(picture, x, y);
                    red = red || (pixel >> 16 & 0xFF) > 0;
                    whole = whole && pixel == (0xFF000000U | GREEN);
                }
            }
        }
        tally.withRed += red ? 1 : 0;
        tally.whole += whole ? 1 : 0;
        tally.partial += whole || red ? 0 : 1;
    }

    /// What somebody would show who took the window's place on the screen for the window.
    void LookAtScreen(Tally& tally) {
        const auto cookie = xcb_get_image(m_screen->Get(), XCB_IMAGE_FORMAT_Z_PIXMAP, m_screen->Root(), 170,
                                          120, 180, 100, 0xFFFFFFFFU);
        xcb_get_image_reply_t* const reply = xcb_get_image_reply(m_screen->Get(), cookie, nullptr);
        if (reply == nullptr)
            return;
        const auto* const pixels = reinterpret_cast<const std::uint32_t*>(xcb_get_image_data(reply));
        const int count = xcb_get_image_data_length(reply) / 4;
        ++tally.screens;
        tally.screensRed +=
            std::any_of(pixels, pixels + count, [](std::uint32_t pixel) { return (pixel & 0xFFFFFF) == RED; })
                ? 1
                : 0;
        std::free(reply);
    }

    CGWindowID m_shared = 0;
    pid_t m_hammer = 0;
    std::optional<XLink> m_screen;
};

const X11DeskOptions BARE{{.width = 640, .height = 480}};
const X11DeskOptions WITH_PICOM{{.width = 640, .height = 480}, Manager::None, true};
const X11DeskOptions WITH_OPENBOX{{.width = 640, .height = 480}, Manager::Openbox};

} // namespace

class X11HammerOnDesks : public X11Hammer, public testing::WithParamInterface<const X11DeskOptions*> {};

INSTANTIATE_TEST_SUITE_P(Desks, X11HammerOnDesks, testing::Values(&BARE, &WITH_PICOM, &WITH_OPENBOX),
                         [](const testing::TestParamInfo<const X11DeskOptions*>& desk) {
                             const std::string manager =
                                 desk.param->manager == Manager::Openbox ? "openbox" : "bare";
                             return manager + (desk.param->picom ? "_picom" : "");
                         });

TEST_P(X11HammerOnDesks, NeverGetsAPixelIntoAPictureOfAnotherWindow) {
    if (!Begin(*GetParam()))
        return;
    BeginHammering(*GetParam());
    if (HasFatalFailure())
        return;
    const Tally tally = TakePictures(false, [](const Tally& so) {
        return so.pictures > FEWEST && so.whole > so.pictures / 10 && so.screensRed > 0;
    });
    EXPECT_EQ(tally.withRed, 0);
    EXPECT_EQ(tally.failed, 0);
    EXPECT_GT(tally.whole, tally.pictures / 10) << "hardly anything was shown at all";
    EXPECT_GT(tally.pictures, TestRounds(FEWEST));
    EXPECT_GT(tally.screensRed, 0) << "nothing red was near: the test proves nothing";
    EndHammering();
}

TEST_F(X11Hammer, IsSeenWhereItsWindowsAreAskedFor) {
    if (!Begin(BARE))
        return;
    BeginHammering(BARE);
    if (HasFatalFailure())
        return;
    const auto isSeen = [](const Tally& so) { return so.withRed > 0; };
    EXPECT_TRUE(isSeen(TakePictures(true, isSeen))) << "red isn't recognised: the other cases prove nothing";
    EndHammering();
}
