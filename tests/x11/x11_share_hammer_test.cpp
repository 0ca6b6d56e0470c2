// SPDX-License-Identifier: Apache-2.0
#include "tests/x11/x11_share_hammer.h"

#include <cstddef>

/// Shares by pictures of windows under the hammer: in no delivered frame is there any red.

namespace {

constexpr HammeredShare DESKTOP_BY_DEFAULT{"DesktopByDefault", SHARE_CAPTURE_ENGINE_TYPE_DESKTOP,
                                           SCREEN_CAPTURER_TYPE_DEFAULT};
constexpr HammeredShare APPLICATION_BY_DEFAULT{"ApplicationByDefault", SHARE_CAPTURE_ENGINE_TYPE_APP,
                                               SCREEN_CAPTURER_TYPE_DEFAULT};
constexpr HammeredShare WINDOW_BY_DEFAULT{"WindowByDefault", SHARE_CAPTURE_ENGINE_TYPE_WINDOW,
                                          SCREEN_CAPTURER_TYPE_DEFAULT};
constexpr HammeredShare DESKTOP_QUEUED{"DesktopQueued", SHARE_CAPTURE_ENGINE_TYPE_DESKTOP,
                                       SCREEN_CAPTURER_TYPE_CGS_GCD};
constexpr HammeredShare APPLICATION_QUEUED{"ApplicationQueued", SHARE_CAPTURE_ENGINE_TYPE_APP,
                                           SCREEN_CAPTURER_TYPE_CGS_GCD};
constexpr HammeredShare WINDOW_QUEUED{"WindowQueued", SHARE_CAPTURE_ENGINE_TYPE_WINDOW,
                                      SCREEN_CAPTURER_TYPE_CGS_GCD};

/// What is seen in the frames. Threads: any.
class FrameJudge {
public:
    struct Tally {
        int frames = 0;
        int alive = 0;      ///< Of them, those that show much of the green window.
        int withRed = 0;    ///< Of them, those with a forbidden pixel,
        long redPixels = 0; ///< and how many pixels that were.
        std::string firstRed;
    };

    void Look(IShareFrame& frame, int beat) {
        constexpr int MUCH = 2000;
        const TVLSize size = SizeOf(frame);
        int green = 0;
        int red = 0;
        std::string firstRed;
        for (int y = 0; y < size.cy; ++y) {
            const unsigned char* const row = frame.GetFrameLineData(y);
            for (int x = 0; x < size.cx; ++x) {
                const unsigned char* const pixel = row + static_cast<std::ptrdiff_t>(x) * 4;
                green += pixel[0] == 0 && pixel[1] == 0xFF && pixel[2] == 0 ? 1 : 0;
                if (pixel[0] == 0)
                    continue;
                if (red++ == 0)
                    firstRed = std::to_string(x) + "," + std::to_string(y);
            }
        }
        const std::lock_guard<std::mutex> lock(m_mutex);
        ++m_tally.frames;
        m_tally.alive += green > MUCH ? 1 : 0;
        m_tally.withRed += red > 0 ? 1 : 0;
        m_tally.redPixels += red;
        if (red > 0 && m_tally.firstRed.empty())
            m_tally.firstRed =
                firstRed + " of frame " + std::to_string(m_tally.frames) + " in beat " + std::to_string(beat);
    }

    Tally Seen() const {
        const std::lock_guard<std::mutex> lock(m_mutex);
        return m_tally;
    }

private:
    mutable std::mutex m_mutex;
    Tally m_tally; // guarded by m_mutex
};

/// A share holds frames back for half a second after what is to be seen of its windows has changed, so there
/// are three parts: beneath a red lid, where nothing of all that changes what is to be seen, and frames go on
/// coming; in the open; and a rest long enough for frames to come again, into which the next part bursts.

constexpr const char* HAMMER_BENEATH_LID = "255 130 230 140";
constexpr const char* HAMMER_IN_THE_OPEN = "100 160 200 180";
constexpr const char* REST = HammerPlan::REST;
constexpr const char* NARROW = "place shared 40 120 200 150";
constexpr const char* WIDE = "place shared 40 120 340 150";
constexpr const char* POPUP_ON_GREEN = "50 150 50 60 00ff00 override none slow=25";
constexpr const char* POPUP_ON_LID = "300 150 90 80 00ff00 override none slow=25";

constexpr int FIRST_IN_THE_OPEN = 16;
const HammerPlan PLAN{{{0, HAMMER_BENEATH_LID, NARROW},
                       {2, nullptr, WIDE},
                       {3, nullptr, nullptr, POPUP_ON_GREEN},
                       {4, nullptr, NARROW},
                       {5, nullptr, "place shared 40 120 400 150"},
                       {7, nullptr, nullptr, POPUP_ON_GREEN},
                       {8, nullptr, "place shared 40 120 120 150"},
                       {10, nullptr, WIDE},
                       {11, nullptr, NARROW},
                       {12, nullptr, WIDE, POPUP_ON_GREEN},
                       {14, nullptr, NARROW},
                       {15, nullptr, WIDE},
                       {FIRST_IN_THE_OPEN, HAMMER_IN_THE_OPEN, "place shared 60 100 180 120"},
                       {17, nullptr, "unmap shared", POPUP_ON_LID},
                       {18, nullptr, "map shared"},
                       {19, REST, NARROW},
                       {27, HAMMER_IN_THE_OPEN, nullptr, POPUP_ON_LID},
                       {28, nullptr, "place shared 40 120 260 210"},
                       {29, nullptr, "unmap shared"},
                       {30, REST, "map shared"},
                       {31, nullptr, NARROW}},
                      38};

class X11PictureHammer : public X11ShareHammer {
protected:
    /// Fewer frames prove nothing.
    static constexpr int FEWEST = 8;

    static std::chrono::seconds Duration() { return std::chrono::seconds(TestEffort() > 1 ? 60 : 1); }

    X11PictureHammer() : X11ShareHammer(PLAN) {}

    void Prepare() {
        X11ShareHammer::Prepare([this](IShareFrame& frame) { m_judge.Look(frame, Beat()); });
    }
    /// From here on whatever comes is judged.
    void Start() {
        X11ShareHammer::Start([this] { return m_judge.Seen().alive > 0; });
    }

    void Print(const FrameJudge::Tally& seen) const {
        std::cout << GetParam().name << ", seed " << SEED << ": frames checked: " << seen.frames
                  << ", with life: " << seen.alive << ", with forbidden pixels: " << seen.withRed
                  << ", forbidden pixels: " << seen.redPixels;
        if (!seen.firstRed.empty())
            std::cout << ", the first at " << seen.firstRed;
        std::cout << "\n";
    }

    FrameJudge m_judge;
};

class X11ShareHammerOfAll : public X11PictureHammer {};
class X11ShareHammerSeen : public X11PictureHammer {
protected:
    /// Leaves out what keeps it out, or shares it as well.
    void LetRedIn() {
        if (GetParam().type == SHARE_CAPTURE_ENGINE_TYPE_APP) {
            EXPECT_EQ((*m_client)->AddSharedProcess(static_cast<unsigned>(m_hammer)), 0);
        }
        if (GetParam().type == SHARE_CAPTURE_ENGINE_TYPE_WINDOW) {
            EXPECT_EQ((*m_client)->AddSharedWindow(m_lid), 0);
        }
    }
};

} // namespace

INSTANTIATE_TEST_SUITE_P(Kinds, X11ShareHammerOfAll,
                         testing::Values(DESKTOP_BY_DEFAULT, DESKTOP_QUEUED, APPLICATION_BY_DEFAULT,
                                         APPLICATION_QUEUED, WINDOW_BY_DEFAULT, WINDOW_QUEUED),
                         [](const auto& each) { return std::string(each.param.name); });

INSTANTIATE_TEST_SUITE_P(Kinds, X11ShareHammerSeen,
                         testing::Values(DESKTOP_BY_DEFAULT, APPLICATION_BY_DEFAULT, WINDOW_BY_DEFAULT),
                         [](const auto& each) { return std::string(each.param.name); });

TEST_P(X11ShareHammerOfAll, NeverGetsAPixelIntoAFrame) {
    Prepare();
    KeepHammerOut();
    Start();
    if (HasFatalFailure())
        return;
    const int before = m_judge.Seen().frames;
    PlayWhile(0, [&](auto passed) {
        const FrameJudge::Tally seen = m_judge.Seen();
        const bool isEnough = seen.frames >= before + FEWEST && seen.alive > 0;
        return passed < Duration() || (!isEnough && passed < PATIENCE);
    });
    EXPECT_EQ(m_client->Statistic().eCaptureMode, GetParam().mode) << "what was judged is another one";
    EndPlay();
    const FrameJudge::Tally seen = m_judge.Seen();
    Print(seen);
    EXPECT_EQ(seen.redPixels, 0);
    EXPECT_GE(seen.frames, before + FEWEST);
    EXPECT_GE(seen.alive, TestEffort() > 1 ? seen.frames / 10 : 1) << "hardly anything was shown at all";
}

TEST_P(X11ShareHammerSeen, IsSeenWhereItIsNotKeptOut) {
    Prepare();
    Start();
    if (HasFatalFailure())
        return;
    LetRedIn();
    const auto isRedSeen = [&] { return m_judge.Seen().withRed > 0; };
    PlayWhile(FIRST_IN_THE_OPEN, [&](auto passed) { return !isRedSeen() && passed < 5 * Duration(); });
    // A window that is never left alone may take long to count as painted.
    EXPECT_TRUE(Hammer().Tell("calm"));
    ComesTrue(isRedSeen);
    EndPlay();
    Print(m_judge.Seen());
    EXPECT_GT(m_judge.Seen().redPixels, 0) << "red isn't recognised: the other cases prove nothing";
}
