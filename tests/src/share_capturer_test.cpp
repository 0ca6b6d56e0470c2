// SPDX-License-Identifier: Apache-2.0
#include "src/share_capturer.h"

#include "src/app_share_config.h"
#include "tests/src/share_capturer_tools.h"
#include "tests/support/call_on_thread.h"
#include "tests/support/engine_bench.h"
#include "tests/support/fake_window_server.h"

#include <gtest/gtest.h>

#include <chrono>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

// What every capturer of the library's own has: plain answers, sinks, a size and a place.

namespace {

using Lines = std::vector<std::string>;

constexpr unsigned ALL_BITS = 0xFFFFFFFFu;

} // namespace

// ---- Plain answers

TEST_F(ShareCapturer, AnswersPlainlyWhatItDoesNotOffer) {
    EXPECT_EQ(capturer.SetCaptureMaxSize({640, 480}), 0);
    EXPECT_EQ(capturer.CShareCapturer::GetCurrentCaptureDisplayId(), ALL_BITS);
    EXPECT_EQ(capturer.AddSharedProcess(1), -3);
    EXPECT_EQ(capturer.RemoveSharedProcess(1), -3);
    EXPECT_EQ(capturer.SelectSharedDisplay(1), -3);
    EXPECT_FALSE(capturer.PointerCaptured());
    EXPECT_EQ(capturer.SetFPS(30), -5);
    EXPECT_FALSE(capturer.Reinit());
    EXPECT_FALSE(capturer.IsWindowAreaBaseContentSupport());
    EXPECT_EQ(capturer.SetCaptureThreadCount(2), -5);
    EXPECT_FALSE(capturer.IsIpcCapturer());
    capturer.Stop();
    EXPECT_EQ(trace.Lines(), Lines{});
    TVLSize size{};
    context->GetCaptureMaxSize(size);
    EXPECT_EQ(size, (TVLSize{2880, 1800})) << "the maximum size went no further";
}

TEST_F(ShareCapturer, ScalesAsTheProcessDoes) {
    AppShareConfig::Instance()->SetCurrentScale(2.5F);
    EXPECT_EQ(capturer.GetScaleFactor(), 2.5F);
    AppShareConfig::Instance()->SetCurrentScale(1.0F);
    EXPECT_EQ(capturer.GetScaleFactor(), 1.0F);
}

TEST_F(ShareCapturer, KeepsAShareOfItsContext) {
    EXPECT_EQ(capturer.m_shareCapturerContext, context);
    EXPECT_EQ(context.use_count(), 2);
    {
        CCapturerProbe other(context);
        EXPECT_EQ(context.use_count(), 3);
    }
    EXPECT_EQ(context.use_count(), 2);
}

TEST_F(ShareCapturer, ForwardsWindowsAndUnsharedProcessesToItsContext) {
    context->SetShareType(SHARE_TYPE_WINDOW); // a desktop share shows everything
    EXPECT_EQ(capturer.AddSharedWindow(7), 0);
    EXPECT_TRUE(context->IsWindowShared(7));
    EXPECT_TRUE(capturer.IsWindowShared(7));
    EXPECT_FALSE(capturer.IsWindowShared(8));
    EXPECT_EQ(capturer.RemoveSharedWindow(7), 0);
    EXPECT_FALSE(context->IsWindowShared(7));
    EXPECT_EQ(capturer.RemoveSharedWindow(7), -1);

    EXPECT_EQ(capturer.AddUnSharedWindow(9), 0);
    EXPECT_EQ(context->GetUnSharedWindowCount(), 1);
    EXPECT_EQ(capturer.RemoveUnSharedWindow(9), 0);
    EXPECT_EQ(context->GetUnSharedWindowCount(), 0);

    EXPECT_EQ(capturer.AddUnSharedProcess(11), 0);
    EXPECT_TRUE(context->IsAppUnShared(11));
    EXPECT_EQ(capturer.RemoveUnSharedProcess(11), 0);
    EXPECT_FALSE(context->IsAppUnShared(11));

    context->SetShareType(SHARE_TYPE_APP);
    EXPECT_FALSE(capturer.IsAppShared(12));
    context->AddSharedApp(12);
    EXPECT_TRUE(capturer.IsAppShared(12));
}

TEST_F(ShareCapturer, KeepsItsOwnProcessOutThroughItsContext) {
    EXPECT_EQ(capturer.SetFilterSelf(true), 0);
    EXPECT_EQ(context->GetUnSharedAppCount(), 1);
    EXPECT_EQ(capturer.SetFilterSelf(false), 0);
    EXPECT_EQ(context->GetUnSharedAppCount(), 0);
}

TEST_F(ShareCapturer, HandsOnWhatItsContextRefuses) {
    EXPECT_EQ(capturer.AddSharedWindow(SHARE_INVALID_WINDOW), -2);
    EXPECT_EQ(capturer.AddUnSharedProcess(SHARE_INVALID_PROCESS), -2);
}

TEST_F(ShareCapturerAlone, GivesMinusFourForWhatAContextWouldAnswer) {
    EXPECT_EQ(capturer.SetFilterSelf(true), -4);
    EXPECT_EQ(capturer.AddSharedWindow(1), -4);
    EXPECT_EQ(capturer.RemoveSharedWindow(1), -4);
    EXPECT_EQ(capturer.AddUnSharedWindow(1), -4);
    EXPECT_EQ(capturer.RemoveUnSharedWindow(1), -4);
    EXPECT_EQ(capturer.AddUnSharedProcess(1), -4);
    EXPECT_EQ(capturer.RemoveUnSharedProcess(1), -4);
    EXPECT_FALSE(capturer.IsAppShared(1));
    EXPECT_FALSE(capturer.IsWindowShared(1));
}

// ---- Sinks

TEST_F(ShareCapturer, RefusesANullSink) {
    EXPECT_EQ(capturer.AddSink(nullptr), -1);
    EXPECT_EQ(capturer.RemoveSink(nullptr), -1);
    EXPECT_TRUE(capturer.m_vecSinks.empty());
    EXPECT_EQ(capturer.FindSink(nullptr), capturer.m_vecSinks.end());
}

TEST_F(ShareCapturer, TakesASinkOnlyOnceAndTracesTheSecondTime) {
    EXPECT_EQ(capturer.AddSink(&sink), 0);
    EXPECT_EQ(trace.Lines(), Lines{});
    EXPECT_EQ(capturer.AddSink(&sink), -1);
    EXPECT_EQ(trace.Lines(), Lines{Debug("[CShareCapturer::AddSink] already exist")});
    EXPECT_EQ(capturer.m_vecSinks, std::vector<IShareCapturerSink*>{&sink});
}

TEST_F(ShareCapturer, RemovesASinkAndKeepsTheOrderOfTheOthers) {
    CCapturerSink second(calls, "second ");
    CCapturerSink third(calls, "third ");
    EXPECT_EQ(capturer.RemoveSink(&sink), -1) << "it is not there";
    for (CCapturerSink* const one : {&sink, &second, &third})
        EXPECT_EQ(capturer.AddSink(one), 0);
    EXPECT_EQ(capturer.RemoveSink(&second), 0);
    EXPECT_EQ(capturer.m_vecSinks, (std::vector<IShareCapturerSink*>{&sink, &third}));
    EXPECT_EQ(capturer.RemoveSink(&second), -1);
    EXPECT_EQ(capturer.FindSink(&third), capturer.m_vecSinks.begin() + 1);
    EXPECT_EQ(capturer.FindSink(&second), capturer.m_vecSinks.end());
}

TEST_F(ShareCapturer, CleansItsSinksWithoutCallingThem) {
    capturer.AddSink(&sink);
    EXPECT_EQ(capturer.CleanSink(), 0);
    EXPECT_TRUE(capturer.m_vecSinks.empty());
    EXPECT_EQ(capturer.CleanSink(), 0);
    EXPECT_EQ(calls.Calls(), Lines{});
}

TEST_F(ShareCapturer, TellsEachSinkInTheOrderOfAdding) {
    CCapturerSink second(calls, "second ");
    capturer.AddSink(&sink);
    capturer.AddSink(&second);
    capturer.NotifyCaptureDisplaySizedChanged({800, 600});
    capturer.NotifyCaptureNoSharedApp();
    capturer.NotifyCaptureSharedAppDisplayChange(5, -1, 2, 3, 4);
    capturer.NotifyCaptureDisplayChanged(true);
    capturer.NotifyCaptureDisplayChanged(false);
    EXPECT_EQ(calls.Calls(),
              (Lines{"size 800,600", "second size 800,600", "no shared app", "second no shared app",
                     "app display 5,-1,2,3,4", "second app display 5,-1,2,3,4", "display 1",
                     "second display 1", "display 0", "second display 0"}));
}

TEST_F(ShareCapturer, SkipsAPlaceWithoutASink) {
    capturer.m_vecSinks = {nullptr, &sink};
    capturer.NotifyCaptureNoSharedApp();
    capturer.NotifyCaptureShareSourceModified(nullptr, SHARE_CAPTURER_SOURCE_NOTIFY_ADDED);
    EXPECT_EQ(calls.Calls(), (Lines{"no shared app", "added null"}));
}

TEST_F(ShareCapturer, EndsTheWalkWhereTheListEndsWhenSinksTakeThemselvesOff) {
    CCapturerSink last(calls, "last ");
    capturer.AddSink(&sink);
    capturer.AddSink(&last);
    last.hook = [&] { EXPECT_EQ(capturer.RemoveSink(&last), 0); };
    capturer.NotifyCaptureNoSharedApp();
    EXPECT_EQ(calls.Calls(), (Lines{"no shared app", "last no shared app"}));
    calls.Clear();
    sink.hook = [&] { capturer.CleanSink(); };
    capturer.AddSink(&last);
    capturer.NotifyCaptureNoSharedApp();
    EXPECT_EQ(calls.Calls(), Lines{"no shared app"});
    capturer.NotifyCaptureNoSharedApp();
    EXPECT_EQ(calls.Calls(), Lines{"no shared app"});
}

TEST_F(ShareCapturer, TellsASinkThatIsAddedDuringTheWalk) {
    CCapturerSink late(calls, "late ");
    capturer.AddSink(&sink);
    sink.hook = [&] { capturer.AddSink(&late); };
    capturer.NotifyCaptureNoSharedApp();
    EXPECT_EQ(calls.Calls(), (Lines{"no shared app", "late no shared app"}));
}

TEST_F(ShareCapturer, TellsTheOtherSinksWhenOneThrows) {
    CCapturerSink second(calls, "second ");
    capturer.AddSink(&sink);
    capturer.AddSink(&second);
    sink.hook = [] { throw std::runtime_error("oops"); };
    EXPECT_NO_THROW(capturer.NotifyCaptureNoSharedApp());
    EXPECT_EQ(calls.Calls(), (Lines{"no shared app", "second no shared app"}));
    ASSERT_EQ(trace.Lines().size(), 1u);
    EXPECT_TRUE(IsLineAt(trace.Lines()[0], Error("[CShareCapturer::TellSinks]>>sink threw oops"),
                         "src/share_capturer"));
}

TEST_F(ShareCapturer, TellsARemovedSinkNothingOnceTheRemovalHasReturned) {
    CTally inside;
    CGate gate;
    capturer.AddSink(&sink);
    sink.hook = [&] {
        inside.Add();
        EXPECT_TRUE(gate.Passes());
    };
    std::thread notice([&] { capturer.NotifyCaptureDisplayChanged(true); });
    EXPECT_TRUE(inside.Reaches(1));
    {
        const CCallOnThread removal([&] { capturer.RemoveSink(&sink); });
        removal.UntilItWaits();
        EXPECT_FALSE(removal.HasReturned()) << "the sink is inside a call";
        gate.Open();
    }
    notice.join();
    capturer.NotifyCaptureDisplayChanged(true);
    EXPECT_EQ(calls.Calls(), Lines{"display 1"});
}

// ---- Size and place

TEST_F(ShareCapturer, HasThePlaceOfItsFirstSource) {
    int x = 1;
    int y = 2;
    int width = 3;
    int height = 4;
    EXPECT_EQ(capturer.GetCurrentCaptureSourcePosition(x, y, width, height), -1);
    capturer.m_vecShareSources.push_back(nullptr);
    EXPECT_EQ(capturer.GetCurrentCaptureSourcePosition(x, y, width, height), -1);
    capturer.m_vecShareSources.clear();
    EXPECT_EQ((std::vector<int>{x, y, width, height}), (std::vector<int>{1, 2, 3, 4}));
    capturer.AddCaptureShareSource(Source(1, SHARE_SOURCE_TYPE_MONITOR, {-10, 20, 630, 500}));
    capturer.AddCaptureShareSource(Source(2, SHARE_SOURCE_TYPE_MONITOR, {0, 0, 5, 5}));
    EXPECT_EQ(capturer.GetCurrentCaptureSourcePosition(x, y, width, height), 0);
    EXPECT_EQ((std::vector<int>{x, y, width, height}), (std::vector<int>{-10, 20, 640, 480}));
}

TEST_F(ShareCapturer, HasNoSizeWhileNothingIsShared) {
    const CFakeWindowServerScope server;
    server->SetDisplays({FakeDisplay(5, {{10, 20}, {640, 480}}, 2.0F)});
    capturer.display = 5;
    TVLSize size{1, 2};
    EXPECT_EQ(capturer.GetCurrentCaptureSourceSize(size), -1);
    capturer.m_vecShareSources.push_back(nullptr);
    EXPECT_EQ(capturer.GetCurrentCaptureSourceSize(size), -1);
    EXPECT_EQ(size, (TVLSize{1, 2}));
}

TEST_F(ShareCapturer, HasTheSizeOfItsDisplaysPictureOnceSomethingIsShared) {
    const CFakeWindowServerScope server;
    server->SetDisplays({FakeDisplay(5, {{10, 20}, {640, 480}}, 2.0F)});
    capturer.display = 5;
    TVLSize size{};
    context->AddSharedWindow(1);
    EXPECT_EQ(capturer.GetCurrentCaptureSourceSize(size), 0);
    EXPECT_EQ(size, (TVLSize{1280, 960}));
    context->RemoveSharedWindow(1);
    EXPECT_EQ(capturer.GetCurrentCaptureSourceSize(size), -1);
    context->AddSharedApp(1);
    EXPECT_EQ(capturer.GetCurrentCaptureSourceSize(size), 0);
    context->RemoveSharedApp(1);
    EXPECT_EQ(capturer.GetCurrentCaptureSourceSize(size), -1);
    capturer.AddCaptureShareSource(Source(1));
    EXPECT_EQ(capturer.GetCurrentCaptureSourceSize(size), 0);
    capturer.display = ALL_BITS;
    EXPECT_EQ(capturer.GetCurrentCaptureSourceSize(size), -1);
    EXPECT_EQ(size, (TVLSize{1280, 960}));
}

TEST_F(ShareCapturerAlone, HasTheSizeOfItsDisplaysPictureWithoutASource) {
    const CFakeWindowServerScope server;
    server->SetDisplays({FakeDisplay(5, {{0, 0}, {640, 480}})});
    TVLSize size{};
    EXPECT_EQ(capturer.GetCurrentCaptureSourceSize(size), -1);
    capturer.display = 5;
    EXPECT_EQ(capturer.GetCurrentCaptureSourceSize(size), 0);
    EXPECT_EQ(size, (TVLSize{640, 480}));
}

// ---- Windows on several monitors

namespace {

class CrossMonitors : public ShareCapturer {
protected:
    CrossMonitors() { capturer.AddSink(&sink); }
    void Pass(bool cross, int afterMs = 0) {
        m_clock->Advance(std::chrono::milliseconds(afterMs));
        capturer.NotifyCaptureAppsCrossMultiMonitor(cross);
    }
    CManualClockScope m_clock;
};

} // namespace

TEST_F(CrossMonitors, AreToldOfOnceTheyHaveStoodForMoreThanASecond) {
    Pass(true);
    Pass(true, 1000);
    EXPECT_EQ(calls.Calls(), Lines{});
    Pass(true, 1);
    EXPECT_EQ(calls.Calls(), Lines{"cross 1"});
    Pass(true, 5000);
    EXPECT_EQ(calls.Calls(), Lines{"cross 1"}) << "once";
    Pass(false);
    Pass(false, 1001);
    EXPECT_EQ(calls.Calls(), (Lines{"cross 1", "cross 0"}));
}

TEST_F(CrossMonitors, AreNotToldOfWhenTheyGoBackWithinThatSecond) {
    Pass(true);
    Pass(false, 999);
    Pass(false, 1001);
    Pass(false, 5000);
    EXPECT_EQ(calls.Calls(), Lines{});
}

TEST_F(CrossMonitors, StartTheirSecondAnewAtEachChange) {
    Pass(true);
    Pass(false, 600);
    Pass(true, 600);
    Pass(true, 1000);
    EXPECT_EQ(calls.Calls(), Lines{});
    Pass(true, 1);
    EXPECT_EQ(calls.Calls(), Lines{"cross 1"});
}

TEST_F(CrossMonitors, AreNoNewsFromTheStartWhenThereAreNone) {
    Pass(false);
    Pass(false, 5000);
    EXPECT_EQ(calls.Calls(), Lines{});
}

TEST_F(CrossMonitors, AreTimedAcrossTheEndOfThe32BitTick) {
    // The tick in ms, cut to 32 bits, starts again in 500 ms.
    constexpr long long WRAP_MS = 1LL << 32;
    const long long now = tick_policy::now() / 1000;
    m_clock->Advance(std::chrono::milliseconds(WRAP_MS - 500 - now));
    Pass(true);
    Pass(true, 1000);
    EXPECT_EQ(calls.Calls(), Lines{});
    Pass(true, 1);
    EXPECT_EQ(calls.Calls(), Lines{"cross 1"});
}
