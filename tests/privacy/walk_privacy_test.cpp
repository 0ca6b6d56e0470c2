// SPDX-License-Identifier: Apache-2.0
#include "platform/window_server.h"
#include "src/app_share_config.h"
#include "src/mac/share_capturer_context_mac.h"
#include "src/mac/share_util_mac.h"
#include "tests/privacy/privacy_oracle.h"
#include "tests/privacy/privacy_scene.h"
#include "tests/support/test_effort.h"
#include "util/cm_clock.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <memory>
#include <ostream>
#include <vector>

/// The window walk before the privacy oracle: whoever shows the screen where the walk says so and paints over
/// what it calls overlap and background shows nothing that is kept out.

namespace {

constexpr unsigned FIRST_SEED = 61'000;
constexpr int SCENES = 300;
constexpr std::uint32_t FILL = 0x009E9E;

/// What somebody may get wrong.
enum class PrivacyFault {
    None,
    OneWindowTooMany,
    ExcludedListsForgotten,
    OverlapShown,
    BackgroundShown,
    MenuBarRuleForgotten,
    RegionsOfAnEarlierStack,
    NothingShown,
};

std::ostream& operator<<(std::ostream& out, PrivacyFault fault) {
    constexpr const char* NAMES[] = {"None",
                                     "OneWindowTooMany",
                                     "ExcludedListsForgotten",
                                     "OverlapShown",
                                     "BackgroundShown",
                                     "MenuBarRuleForgotten",
                                     "RegionsOfAnEarlierStack",
                                     "NothingShown"};
    return out << NAMES[static_cast<int>(fault)];
}

/// The first one that is kept out, 0 when there is none.
unsigned FrontmostKeptOut(const PrivacyScene& scene) {
    for (auto window = scene.windows.rbegin(); window != scene.windows.rend(); ++window) {
        if (window->role == PrivacyRole::KeptOut)
            return window->id;
    }
    return 0;
}

void Tell(const PrivacyScene& scene, PrivacyFault fault, ShareCapturerContext& context) {
    for (const unsigned display : scene.sharedDisplays)
        context.AddSharedDisplay(display);
    for (const unsigned pid : scene.sharedApps)
        context.AddSharedApp(pid);
    for (const unsigned window : scene.sharedWindows)
        context.AddSharedWindow(window);
    if (fault != PrivacyFault::ExcludedListsForgotten) {
        for (const unsigned pid : scene.unsharedApps)
            context.AddUnSharedApp(pid);
        for (const unsigned window : scene.unsharedWindows)
            context.AddUnSharedWindow(window);
    }
    if (fault == PrivacyFault::OneWindowTooMany)
        context.AddSharedWindow(FrontmostKeptOut(scene));
    context.SetShareType(scene.shareType);
    context.m_bNoWindowBaseArea = !scene.excludesMenuBars;
    context.m_bExcludeMenuBar = scene.excludesMenuBars && fault != PrivacyFault::MenuBarRuleForgotten;
}

/// A display as a viewer gets it, BGRX.
class DeliveredPicture {
public:
    DeliveredPicture(platform::WindowServer& server, unsigned display) {
        const auto opened =
            server.OpenDisplayStream({.display = display, .framesPerSecond = 60, .withPointer = false});
        if (opened.stream == nullptr)
            return;
        const platform::DisplayPictureResult taken =
            opened.stream->TakeNewest(CmSteadyNow() + platform::DEFAULT_IMAGE_DEADLINE);
        if (taken.picture == nullptr || taken.picture->format != platform::PixelFormat::BGRX)
            return;
        const platform::Picture& picture = *taken.picture;
        m_pixels.assign(picture.pixels,
                        picture.pixels + static_cast<std::size_t>(picture.height) * picture.stride);
        m_frame = {m_pixels.data(), picture.stride, picture.width, picture.height, 2, 1, 0, picture.rect};
        m_scale = picture.scale;
    }

    bool IsThere() const { return m_frame.pixels != nullptr; }
    const PrivacyFrame& Frame() const { return m_frame; }

    /// Paints over a region of the desktop.
    void Fill(TVLRegion& region) {
        region.ProjectRgn(ShareUtilMac::CGRectToTVLRect(m_frame.rect), m_scale);
        std::vector<TVLRect> rects;
        region.GetRects(rects);
        for (const TVLRect& rect : rects)
            FillRect({std::max(0, rect.left), std::max(0, rect.top), std::min(m_frame.width, rect.right),
                      std::min(m_frame.height, rect.bottom)});
    }
    void FillAll() { FillRect({0, 0, m_frame.width, m_frame.height}); }

private:
    void FillRect(const TVLRect& rect) {
        for (int y = rect.top; y < rect.bottom; ++y) {
            for (int x = rect.left; x < rect.right; ++x) {
                std::uint8_t* const pixel =
                    &m_pixels[static_cast<std::size_t>(y) * m_frame.stride + static_cast<std::size_t>(x) * 4];
                pixel[m_frame.red] = FILL >> 16 & 255;
                pixel[m_frame.green] = FILL >> 8 & 255;
                pixel[m_frame.blue] = FILL & 255;
            }
        }
    }

    std::vector<std::uint8_t> m_pixels;
    PrivacyFrame m_frame;
    float m_scale = 1;
};

/// How somebody who goes by the regions hides what isn't to be seen. All of them come to the same, if the
/// regions do.
enum class Hiding {
    OverlapAndBackground,
    AllButVisible,
};

void Hide(const ShareCapturerContext& context, Hiding hiding, PrivacyFault fault, DeliveredPicture& picture) {
    TVLRegion region;
    if (hiding == Hiding::AllButVisible) {
        context.GetInvisiableRegion(region);
        picture.Fill(region);
    } else {
        context.GetOverlapRegion(region);
        if (fault != PrivacyFault::OverlapShown)
            picture.Fill(region);
        context.GetBackgroundInvisiableRegion(region);
        if (fault != PrivacyFault::BackgroundShown)
            picture.Fill(region);
    }
    if (fault == PrivacyFault::NothingShown)
        picture.FillAll();
}

/// What no share but a desktop's shows, whoever is seen there.
PrivacyMoment WithDocks(const PrivacyScene& scene, PrivacyMoment moment) {
    if (scene.shareType == SHARE_TYPE_DESKTOP)
        return moment;
    for (const unsigned display : scene.sharedDisplays)
        moment.insert(moment.begin(), {PrivacyRole::KeptOut, ShareUtilMac::GetDockBarRect(display)});
    return moment;
}

class WalkPrivacy : public testing::Test {
protected:
    void SetUp() override {
        AppShareConfig::Instance()->m_nShareConfigFlags = 0;
        m_former = platform::ReplaceWindowServer(nullptr);
    }
    void TearDown() override { platform::ReplaceWindowServer(m_former); }

    static PrivacyFindings Judge(unsigned seed, PrivacyFault fault = PrivacyFault::None) {
        const PrivacyScene scene = RandomPrivacyScene::Make(seed);
        platform::ReplaceWindowServer(scene.server);
        ShareCapturerContextMac context;
        Tell(scene, fault, context);
        // The first one finds the displays by which the second one knows a menu bar.
        context.UpdateShareCapturerContext();
        context.UpdateShareCapturerContext();
        if (fault == PrivacyFault::RegionsOfAnEarlierStack)
            scene.server->MoveWindow(FrontmostKeptOut(scene), {30, 30});
        PrivacyFindings findings;
        for (const unsigned display : scene.sharedDisplays) {
            for (const Hiding hiding : {Hiding::OverlapAndBackground, Hiding::AllButVisible})
                findings += JudgeDisplay(scene, display, context, hiding, fault);
        }
        return findings;
    }

private:
    static PrivacyFindings JudgeDisplay(const PrivacyScene& scene, unsigned display,
                                        const ShareCapturerContext& context, Hiding hiding,
                                        PrivacyFault fault) {
        DeliveredPicture picture(*scene.server, display);
        EXPECT_TRUE(picture.IsThere());
        if (!picture.IsThere())
            return {};
        Hide(context, hiding, fault, picture);
        return JudgePrivacy(WithDocks(scene, scene.Moment()), picture.Frame());
    }

    std::shared_ptr<platform::WindowServer> m_former;
};

class WrongWalkPrivacy : public WalkPrivacy, public testing::WithParamInterface<PrivacyFault> {};

} // namespace

TEST_F(WalkPrivacy, NoSceneShowsWhatIsKeptOut) {
    const int scenes = TestRounds(SCENES);
    PrivacyFindings all;
    int alive = 0;
    for (int i = 0; i < scenes; ++i) {
        const unsigned seed = FIRST_SEED + static_cast<unsigned>(i);
        const PrivacyFindings findings = Judge(seed);
        ASSERT_EQ(findings.leaks, 0) << "scene of seed " << seed << ": " << ToString(findings);
        ASSERT_EQ(findings.redElsewhere, 0) << "scene of seed " << seed << ": " << ToString(findings);
        ASSERT_EQ(findings.keptShown, findings.keptInFront)
            << "scene of seed " << seed << ": " << ToString(findings);
        alive += findings.keptShown > 0 ? 1 : 0;
        all += findings;
    }
    std::printf("%d scenes from seed %u on, %d with something kept to be seen: %s\n", scenes, FIRST_SEED,
                alive, ToString(all).c_str());
    EXPECT_GE(alive, scenes / 2);
    EXPECT_GT(all.forbidden, 1000L * scenes);
}

TEST_P(WrongWalkPrivacy, IsNoticed) {
    for (int i = 0; i < SCENES; ++i) {
        const PrivacyFindings findings = Judge(FIRST_SEED + static_cast<unsigned>(i), GetParam());
        const bool isLeak = findings.leaks > 0;
        const bool isDead = findings.keptShown != findings.keptInFront;
        if (GetParam() == PrivacyFault::NothingShown ? isDead : isLeak) {
            std::printf("noticed in scene %d: %s\n", i + 1, ToString(findings).c_str());
            return;
        }
    }
    FAIL() << GetParam() << " went unnoticed in " << SCENES << " scenes";
}

INSTANTIATE_TEST_SUITE_P(EachFault, WrongWalkPrivacy,
                         testing::Values(PrivacyFault::OneWindowTooMany, PrivacyFault::ExcludedListsForgotten,
                                         PrivacyFault::OverlapShown, PrivacyFault::BackgroundShown,
                                         PrivacyFault::MenuBarRuleForgotten,
                                         PrivacyFault::RegionsOfAnEarlierStack, PrivacyFault::NothingShown),
                         testing::PrintToStringParamName());
