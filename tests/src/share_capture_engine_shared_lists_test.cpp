// SPDX-License-Identifier: Apache-2.0
#include "tests/src/share_capturer_context_tools.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

/// What an engine makes of the lists of its context: whether it may start, what it answers, and what it tells
/// the sink of the captured windows.

namespace {

using Lines = std::vector<std::string>;

/// An engine on a context that the test can fill like a walk.
template <class Engine>
struct ListsBench : CEngineBench<Engine> {
    ListsBench() {
        context->SetShareType(this->engine->m_spShareCapturerContext->GetShareType());
        this->engine->m_spShareCapturerContext = context;
        this->Forget();
    }

    /// What the sink hears of the windows in a pass after a walk that has found these.
    Lines NoticesOfPassWith(const Values& windows) {
        this->sink.Clear();
        context->m_paramSet.reset();
        context->m_paramSet.vCapturedWindows = windows;
        context->_CommitParamSet(context->m_paramSet);
        this->Pass();
        this->SettleEvents();
        return this->sink.Notices();
    }

    const std::shared_ptr<CContextProbe> context = std::make_shared<CContextProbe>();
};

template <class Bench>
void ExpectNothingToShare(Bench& bench) {
    EXPECT_EQ(bench.engine->Start(), -6);
    EXPECT_EQ(bench.engine->GetCaptureStatus(), SHARE_CAPTURE_ENGINE_STATUS_STOPPED);
}

template <class Bench>
void ExpectStarts(Bench& bench) {
    EXPECT_EQ(bench.engine->Start(), 0);
    EXPECT_EQ(bench.engine->GetCaptureStatus(), SHARE_CAPTURE_ENGINE_STATUS_STARTED);
    EXPECT_EQ(bench.engine->Stop(), 0);
}

} // namespace

TEST(ShareCaptureEngineSharedLists, LetAnApplicationEngineStartOnASharedApplicationAlone) {
    ListsBench<CShareCaptureAppEngine> bench;
    bench.context->AddUnSharedApp(40);
    bench.context->AddSharedWindow(41);
    ExpectNothingToShare(bench);
    bench.context->AddSharedApp(42);
    EXPECT_EQ(bench.engine->GetCaptureShareSourceCount(), 0);
    ExpectStarts(bench);
    bench.context->RemoveSharedApp(42);
    ExpectNothingToShare(bench);
}

TEST(ShareCaptureEngineSharedLists, LetAWindowEngineStartOnASharedWindow) {
    ListsBench<CShareCaptureWindowEngine> bench;
    bench.context->AddUnSharedWindow(40);
    bench.context->AddSharedApp(41);
    ExpectNothingToShare(bench);
    bench.context->AddSharedWindow(42);
    ExpectStarts(bench);
    bench.context->AddUnSharedWindow(42);
    ExpectNothingToShare(bench);
}

TEST(ShareCaptureEngineSharedLists, DoNotLetADesktopEngineStart) {
    ListsBench<CShareCaptureDesktopEngine> bench;
    bench.context->AddSharedApp(41);
    bench.context->AddSharedWindow(42);
    bench.context->AddSharedDisplay(43);
    ExpectNothingToShare(bench);
}

TEST(ShareCaptureEngineSharedLists, AnswerWhetherSomethingIsShared) {
    const CDesktopScope desktop;
    desktop->SetWindows({FakeWindow(7, 500, {{0, 0}, {9, 9}}), FakeWindow(8, 501, {{0, 0}, {9, 9}})});
    ListsBench<CShareCaptureAppEngine> bench;
    bench.context->AddSharedApp(500);
    EXPECT_TRUE(bench.engine->IsAppShared(500));
    EXPECT_FALSE(bench.engine->IsAppShared(501));
    EXPECT_TRUE(bench.engine->IsWindowShared(7));
    EXPECT_FALSE(bench.engine->IsWindowShared(8));
    bench.context->AddUnSharedWindow(7);
    bench.context->AddSharedWindow(8);
    EXPECT_FALSE(bench.engine->IsWindowShared(7));
    EXPECT_TRUE(bench.engine->IsWindowShared(8));
}

TEST(ShareCaptureEngineSharedLists, NeverCallAWindowOrApplicationSharedThatIsNone) {
    const CDesktopScope desktop;
    ListsBench<CShareCaptureDesktopEngine> bench;
    EXPECT_TRUE(bench.context->IsAppShared(0x80000000u)) << "a desktop share shows what isn't kept out";
    EXPECT_FALSE(bench.engine->IsAppShared(0x80000000u));
    EXPECT_TRUE(bench.context->IsWindowShared(0));
    EXPECT_FALSE(bench.engine->IsWindowShared(0));
}

TEST(ShareCaptureEngineSharedLists, TellTheSinkOfAnyChangeOfTheCapturedWindows) {
    ListsBench<CShareCaptureWindowEngine> bench;
    bench.BeginInline();
    EXPECT_EQ(bench.NoticesOfPassWith({}), Lines{}) << "there was none before";
    EXPECT_EQ(bench.NoticesOfPassWith({5, 6}), Lines{"windows 5,6,"});
    EXPECT_EQ(bench.NoticesOfPassWith({5, 6}), Lines{});
    EXPECT_EQ(bench.NoticesOfPassWith({6, 5}), Lines{"windows 6,5,"}) << "order";
    EXPECT_EQ(bench.NoticesOfPassWith({6, 7}), Lines{"windows 6,7,"}) << "one id";
    EXPECT_EQ(bench.NoticesOfPassWith({6}), Lines{"windows 6,"}) << "length";
    EXPECT_EQ(bench.NoticesOfPassWith({6, 6}), Lines{"windows 6,6,"}) << "length alone";
    EXPECT_EQ(bench.NoticesOfPassWith({}), Lines{"windows null"});
}

TEST(ShareCaptureEngineSharedLists, TellTheSinkOnlyOfWindowsOnTheMainDisplay) {
    const CDesktopScope desktop;
    desktop->SetWindows({FakeWindow(5, 500, {{0, 0}, {9, 9}}), FakeWindow(6, 500, {{300, 0}, {9, 9}}),
                         FakeWindow(7, 500, {{310, 0}, {9, 9}})});
    ListsBench<CShareCaptureAppEngine> bench;
    bench.BeginInline();
    bench.context->m_vAppDisplays = {CDesktopScope::RIGHT, CDesktopScope::LEFT};
    bench.context->m_vCapturedWindows = {7, 6, 5};
    bench.Passes(2);
    bench.SettleEvents();
    EXPECT_EQ(bench.sink.Notices(), Lines{"windows 7,6,"});
}

TEST(ShareCaptureEngineSharedLists, AreNotAskedForCapturedWindowsByADesktopEngine) {
    const CDesktopScope desktop;
    const auto lookUpsInAPassOf = [&desktop](auto& bench) {
        bench.BeginInline();
        // To tell which of these are on the main display takes a look-up of each.
        bench.context->m_vAppDisplays = {CDesktopScope::RIGHT, CDesktopScope::LEFT};
        bench.context->m_vCapturedWindows = {7, 6, 5};
        const int before = desktop->calls.windows;
        bench.Pass();
        EXPECT_EQ(bench.sink.FrameCount(), 1u);
        return desktop->calls.windows - before;
    };
    ListsBench<CShareCaptureWindowEngine> window;
    EXPECT_GE(lookUpsInAPassOf(window), 3);
    ListsBench<CShareCaptureDesktopEngine> other;
    EXPECT_EQ(lookUpsInAPassOf(other), 0);
}
