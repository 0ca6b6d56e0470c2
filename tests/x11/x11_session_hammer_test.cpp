// SPDX-License-Identifier: Apache-2.0
#include "platform/window_pins.h"
#include "tests/privacy/privacy_oracle.h"
#include "tests/support/forwarding_window_server.h"
#include "tests/support/sanitizer.h"
#include "tests/x11/x11_share_hammer.h"

#include <algorithm>
#include <chrono>
#include <cstddef>
#include <memory>

/// Shares by capture sessions under the hammer. Their pictures show the whole screen, and what must not be
/// seen is painted over by what a walk has found: here in real time, with and without a compositor that lags.

namespace {

using Clock = std::chrono::steady_clock;

constexpr HammeredShare SHARES[] = {
    {"DesktopBySession", SHARE_CAPTURE_ENGINE_TYPE_DESKTOP, SCREEN_CAPTURER_TYPE_AVFOUNDATION},
    {"DesktopByMix", SHARE_CAPTURE_ENGINE_TYPE_DESKTOP, SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX},
    {"ApplicationBySession", SHARE_CAPTURE_ENGINE_TYPE_APP, SCREEN_CAPTURER_TYPE_AVFOUNDATION},
    {"ApplicationByMix", SHARE_CAPTURE_ENGINE_TYPE_APP, SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX},
    {"WindowBySession", SHARE_CAPTURE_ENGINE_TYPE_WINDOW, SCREEN_CAPTURER_TYPE_AVFOUNDATION},
    {"WindowByMix", SHARE_CAPTURE_ENGINE_TYPE_WINDOW, SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX},
    {"DesktopBySessionComposited", SHARE_CAPTURE_ENGINE_TYPE_DESKTOP, SCREEN_CAPTURER_TYPE_AVFOUNDATION,
     true},
    {"DesktopByMixComposited", SHARE_CAPTURE_ENGINE_TYPE_DESKTOP, SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX,
     true},
    {"ApplicationBySessionComposited", SHARE_CAPTURE_ENGINE_TYPE_APP, SCREEN_CAPTURER_TYPE_AVFOUNDATION,
     true},
    {"ApplicationByMixComposited", SHARE_CAPTURE_ENGINE_TYPE_APP, SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX,
     true},
    {"WindowBySessionComposited", SHARE_CAPTURE_ENGINE_TYPE_WINDOW, SCREEN_CAPTURER_TYPE_AVFOUNDATION, true},
    {"WindowByMixComposited", SHARE_CAPTURE_ENGINE_TYPE_WINDOW, SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX,
     true},
};

std::string NameOf(const testing::TestParamInfo<HammeredShare>& each) {
    return each.param.name;
}

/// Judges frames by the stack of the pass that they come from. Threads: frames come on one; Seen any.
class SessionJudge {
public:
    struct Tally {
        int frames = 0;
        int alive = 0;   ///< Of them, those that show much of the green window.
        int withRed = 0; ///< Of them, those with any red.
        PrivacyFindings findings;
        std::chrono::milliseconds longestExposure{0};
        std::string firstRed; ///< When and what.
    };

    void Look(IShareFrame& frame, const PrivacyMoment& moment, int beat) {
        constexpr int MUCH = 2000;
        // One that is sent again is of the stack that it was of.
        if (&frame != m_lastFrame)
            m_moment = moment;
        m_lastFrame = &frame;
        const PrivacyFindings findings = JudgePrivacy(m_moment, PixelsOf(frame));
        const bool hasRed =
            findings.leaks + findings.redElsewhere + findings.redNearEdges + findings.redThroughKept > 0;
        const std::lock_guard<std::mutex> lock(m_mutex);
        ++m_tally.frames;
        m_tally.alive += CountGreen(PixelsOf(frame)) > MUCH ? 1 : 0;
        m_tally.withRed += hasRed ? 1 : 0;
        m_tally.findings += findings;
        TimeExposure(hasRed);
        if (hasRed && m_tally.firstRed.empty())
            m_tally.firstRed = "in beat " + std::to_string(beat) + ", frame " +
                               std::to_string(m_tally.frames) + ": " + ToString(findings);
    }

    Tally Seen() const {
        const std::lock_guard<std::mutex> lock(m_mutex);
        return m_tally;
    }

private:
    static PrivacyFrame PixelsOf(IShareFrame& frame) {
        const TVLSize size = SizeOf(frame);
        const TVLRect rect = frame.GetMetaInfo().rectCapture;
        const int first = frame.GetFrameDataFormat() == SHARE_FRAME_FORMAT_ARGB ? 1 : 0;
        PrivacyFrame pixels;
        pixels.pixels = frame.GetFrameData();
        pixels.stride = static_cast<std::size_t>(frame.GetFrameLineBytes());
        pixels.width = size.cx;
        pixels.height = size.cy;
        pixels.red = first;
        pixels.green = first + 1;
        pixels.blue = first + 2;
        pixels.rect = {
            {static_cast<float>(rect.left), static_cast<float>(rect.top)},
            {static_cast<float>(rect.right - rect.left), static_cast<float>(rect.bottom - rect.top)}};
        return pixels;
    }

    /// Nearly as green as can be.
    static int CountGreen(const PrivacyFrame& frame) {
        constexpr int NEARLY_ALL = 0xF0;
        int count = 0;
        for (int y = 0; y < frame.height; ++y) {
            const std::uint8_t* pixel = frame.pixels + static_cast<std::size_t>(y) * frame.stride;
            for (int x = 0; x < frame.width; ++x, pixel += 4)
                count += pixel[frame.red] == 0 && pixel[frame.green] >= NEARLY_ALL && pixel[frame.blue] == 0
                             ? 1
                             : 0;
        }
        return count;
    }

    /// A viewer sees a frame until the next one.
    void TimeExposure(bool hasRed) {
        const Clock::time_point now = Clock::now();
        if (m_exposedSince)
            m_tally.longestExposure =
                std::max(m_tally.longestExposure,
                         std::chrono::duration_cast<std::chrono::milliseconds>(now - *m_exposedSince));
        if (!hasRed)
            m_exposedSince.reset();
        else if (!m_exposedSince)
            m_exposedSince = now;
    }

    // Of the thread that looks.
    PrivacyMoment m_moment;
    const IShareFrame* m_lastFrame = nullptr; // only to tell frames apart
    std::optional<Clock::time_point> m_exposedSince;

    mutable std::mutex m_mutex;
    Tally m_tally; // guarded by m_mutex
};

/// A share holds frames back for half a second after what is to be seen of its windows has changed, and a
/// sample has to show the stack that was walked. So mostly there is one stroke at a time, which bursts into
/// frames that come; and now and then a shower of them, or something that happens to the shared window.
const HammerPlan PLAN{
    {{0, "100 160 200 180 every=700", "place shared 40 120 200 150"},
     {24, "255 130 230 140 every=300", nullptr},
     {36, nullptr, "place shared 40 120 340 150", "300 150 90 80 00ff00 override none slow=25"},
     {37, "100 160 200 180 every=900", nullptr},
     {52, "100 160 200 180", nullptr, "50 150 50 60 00ff00 override none slow=25"},
     {53, HammerPlan::REST, "place shared 60 100 180 120"},
     {62, "100 160 200 180 every=900", "unmap shared"},
     {64, nullptr, "map shared"},
     {76, nullptr, "place shared 40 120 260 210"},
     {86, HammerPlan::REST, nullptr}},
    94};

class X11SessionHammer : public X11ShareHammer {
protected:
    X11SessionHammer() : X11ShareHammer(PLAN) {}

    void Prepare() {
        X11ShareHammer::Prepare(
            [this](IShareFrame& frame) { m_judge.Look(frame, MomentOfThisPass(), Beat()); });
        KeepHammerOut();
    }
    void Start() {
        X11ShareHammer::Start([this] { return m_judge.Seen().alive > 0; });
    }

    /// A session is silent while the screen stands still, so the shared window doesn't; but for a while now
    /// and then, in which samples that were not asked for stay where they are.
    void Pass(std::chrono::milliseconds beat) override {
        constexpr int CHANGES = 4;
        constexpr int SPELL = 5;
        if (Beat() / SPELL % 2 != 0) {
            X11ShareHammer::Pass(beat);
            return;
        }
        for (int i = 0; i < CHANGES; ++i) {
            m_isBright = !m_isBright;
            EXPECT_TRUE(Shown().Tell(m_isBright ? "recolour shared 00ff00" : "recolour shared 00fc00"));
            X11ShareHammer::Pass(beat / CHANGES);
        }
    }

    /// What the pass has walked, as long as that holds.
    PrivacyMoment MomentOfThisPass() const {
        PrivacyMoment moment;
        const std::shared_ptr<const platform::WindowSnapshot> windows = platform::PinnedWindows();
        if (windows == nullptr)
            return moment;
        for (const platform::WindowInfo& info : windows->Windows()) {
            if (info.onScreen)
                moment.push_back({IsKept(info) ? PrivacyRole::Kept : PrivacyRole::KeptOut, info.frame,
                                  info.owner == m_shown ? GREEN : 0U, info.alpha});
        }
        return moment;
    }

    void Print(std::chrono::seconds passed) const {
        const SessionJudge::Tally seen = m_judge.Seen();
        std::cout << GetParam().name << ", seed " << SEED << ", " << passed.count()
                  << " s: frames checked: " << seen.frames << ", with life: " << seen.alive
                  << ", with red: " << seen.withRed << " (" << ToString(seen.findings)
                  << "), longest exposure: " << seen.longestExposure.count() << " ms";
        if (!seen.firstRed.empty())
            std::cout << ", the first " << seen.firstRed;
        std::cout << "\n";
    }

    SessionJudge m_judge;

private:
    static constexpr std::uint32_t GREEN = 0x00FF00;

    bool m_isBright = true;

    bool IsKept(const platform::WindowInfo& info) const {
        switch (GetParam().type) {
            case SHARE_CAPTURE_ENGINE_TYPE_DESKTOP:
                return info.owner != m_hammer;
            case SHARE_CAPTURE_ENGINE_TYPE_APP:
                return info.owner == m_shown;
            default:
                return info.id == m_shared;
        }
    }
};

/// Each of the kinds takes as long as it takes; one with and one without a compositor have to do where a
/// developer waits, and the latter where a sanitizer makes all of it slow.
bool IsForLongFormOnly(const HammeredShare& share) {
    const std::string name = share.name;
    return TestEffort() == 1 && name != "ApplicationByMix" &&
           (name != "DesktopBySessionComposited" || SCREENSHARE_TEST_SANITIZED != 0);
}

class X11SessionHammerOfAll : public X11SessionHammer {
protected:
    void SetUp() override {
        if (IsForLongFormOnly(GetParam()))
            GTEST_SKIP() << "only with SCREENSHARE_TEST_EFFORT above 1";
        X11SessionHammer::SetUp();
    }
};

class X11SessionHammerUnchecked : public X11SessionHammerOfAll {};

} // namespace

INSTANTIATE_TEST_SUITE_P(Kinds, X11SessionHammerOfAll, testing::ValuesIn(SHARES), NameOf);
// Of applications and windows the half second without frames hides nearly all of what the check would.
INSTANTIATE_TEST_SUITE_P(Kinds, X11SessionHammerUnchecked, testing::Values(SHARES[0], SHARES[1]), NameOf);

TEST_P(X11SessionHammerOfAll, NeverGetsAPixelIntoAFrame) {
    constexpr int FEWEST = 20;
    const std::chrono::seconds duration(TestEffort() > 1 ? 60 : 3);
    Prepare();
    Start();
    if (HasFatalFailure())
        return;
    const int before = m_judge.Seen().frames;
    PlayWhile(0, [&](auto passed) {
        const SessionJudge::Tally seen = m_judge.Seen();
        const bool isEnough = seen.frames >= before + FEWEST && seen.alive >= seen.frames / 4;
        return passed < duration || (!isEnough && passed < PATIENCE);
    });
    EXPECT_EQ(m_client->Statistic().eCaptureMode, GetParam().mode) << "what was judged is another one";
    EndPlay();
    Print(duration);
    const SessionJudge::Tally seen = m_judge.Seen();
    EXPECT_EQ(seen.findings.leaks, 0);
    EXPECT_EQ(seen.findings.redElsewhere, 0);
    EXPECT_GE(seen.frames, before + FEWEST);
    EXPECT_GE(seen.alive, seen.frames / 4) << "hardly anything was shown at all";
}

TEST_P(X11SessionHammerUnchecked, IsSeenWhereStacksAreNotTold) {
    const CWindowServerScope blind(std::make_shared<COneStackWindowServer>(platform::CurrentWindowServer()));
    Prepare();
    Start();
    if (HasFatalFailure())
        return;
    const auto start = Clock::now();
    PlayWhile(0, [&](auto passed) { return m_judge.Seen().withRed == 0 && passed < 2 * PATIENCE; });
    const auto passed = std::chrono::duration_cast<std::chrono::seconds>(Clock::now() - start);
    EndPlay();
    Print(passed);
    EXPECT_GT(m_judge.Seen().withRed, 0) << "the check of stacks is not what keeps it out";
    m_client.reset(); // before its server goes
}
