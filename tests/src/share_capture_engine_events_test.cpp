// SPDX-License-Identifier: Apache-2.0
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

// The way of a notification from whoever finds something out to the client's sink.

namespace {

using Texts = std::vector<std::string>;

class Notifications : public testing::Test {
protected:
    Texts Told() {
        bench.SettleEvents();
        return bench.sink.Notices();
    }

    CEngineBench<> bench{true};
};

} // namespace

TEST_F(Notifications, ReachTheSinkOnTheAssistThreadInTheOrderOfPosting) {
    bench.BeginInline();
    bench.engine->OnCaptureError(5);
    bench.engine->OnCaptureEvent(7, 8, nullptr);
    bench.engine->OnCaptureStatusChanged(3);
    bench.engine->OnCapturePositionChanged(1, 2, 3, 4);
    bench.engine->OnCapturedAppsCrossMultiMonitors(true);
    bench.engine->OnCapturedAppsCrossMultiMonitors(false);
    bench.engine->OnCapturedNoSharedApp();
    EXPECT_EQ(Told(), (Texts{"error 5", "event 7 8", "status 3", "position 1,2 3x4", "event 1 1", "event 1 0",
                             "error -204"}));
    EXPECT_EQ(bench.sink.ThreadOfNotice("error 5"), bench.engine->_GetAssistThread()->GetThreadId());
}

TEST_F(Notifications, TraceOnTheSideThatIsToldFor) {
    bench.BeginInline();
    bench.engine->OnCaptureStatusChanged(3);
    bench.engine->OnCaptureEvent(7, 8, nullptr);
    EXPECT_EQ(bench.trace.Lines(), (Texts{Info("[CShareCaptureEngine::OnCaptureStatusChanged]>> status=3"),
                                          Info("[CShareCaptureEngine::OnCaptureEvent, eventType=7")}));
    Told();
    bench.Forget();
    std::vector<unsigned> windows{11, 12};
    bench.engine->OnCapturedWindowChanged(windows);
    bench.engine->OnCapturePositionChanged(1, 2, 3, 4);
    bench.engine->OnCaptureError(-9);
    Told();
    EXPECT_EQ(bench.trace.Lines(), (Texts{Info("[CShareCaptureEngine::OnCapturedWindowChanged 11,12,"),
                                          Info("[CShareCaptureEngine::OnCapturePositionChanged]>>,rect="
                                               "{left:1,top:2,right:4,bottom:6,width:3,height:4}"),
                                          Info("[CShareCaptureEngine::OnCaptureError, nErrorCode=-9")}));
}

TEST_F(Notifications, TellOfContentThatIsUnavailableWithoutATrace) {
    bench.BeginInline();
    bench.engine->OnCaptureEvent(SHARE_CAPTURE_EVENT_CONTENT_UNAVAILABLE, SHARE_CAPTURE_DRAGGING, nullptr);
    EXPECT_EQ(Told(), Texts{"event 1001 -303"});
    EXPECT_TRUE(bench.trace.Lines().empty());
}

TEST_F(Notifications, CarryTheWindowListAsItWasWhenItWasTold) {
    bench.BeginInline();
    std::vector<unsigned> windows{5, 6};
    bench.engine->OnCapturedWindowChanged(windows);
    windows = {9};
    windows.clear();
    bench.engine->OnCapturedWindowChanged(windows);
    EXPECT_EQ(Told(), (Texts{"windows 5,6,", "windows null"}));
}

TEST_F(Notifications, TellOfTheDisplayGoneAndNothingOfOneThatCame) {
    bench.BeginInline();
    EXPECT_EQ(bench.engine->OnCapturedDisplayChanged(true), 0);
    EXPECT_EQ(Told(), Texts{});
    EXPECT_FALSE(bench.engine->m_bDisplayGone);
    EXPECT_TRUE(bench.trace.Lines().empty());
    EXPECT_EQ(bench.engine->OnCapturedDisplayChanged(false), 0);
    EXPECT_EQ(Told(), Texts{"error -203"});
    EXPECT_TRUE(bench.engine->m_bDisplayGone);
}

TEST_F(Notifications, MarkTheDisplayGoneWithoutASinkAndDropTheRest) {
    EXPECT_EQ(bench.engine->OnCaptureError(SHARE_CAPTURE_DISPLAY_GONE), 0);
    EXPECT_TRUE(bench.engine->m_bDisplayGone);
    EXPECT_EQ(bench.engine->OnCaptureEvent(7, 8, nullptr), 0);
    EXPECT_EQ(bench.engine->OnCaptureStatusChanged(3), 0);
    EXPECT_EQ(bench.engine->OnCapturePositionChanged(1, 2, 3, 4), 0);
    EXPECT_TRUE(bench.trace.Lines().empty());
    bench.BeginInline();
    EXPECT_EQ(Told(), Texts{});
}

TEST_F(Notifications, IgnoreSourcesThatCameOrWent) {
    bench.BeginInline();
    EXPECT_EQ(bench.engine->OnShareSourceAdded(nullptr), 0);
    EXPECT_EQ(bench.engine->OnShareSourceRemoved(nullptr), 0);
    EXPECT_EQ(Told(), Texts{});
}

TEST_F(Notifications, OfAnApplicationsDisplayMoveThePointerAndTellPositionAndSize) {
    bench.BeginInline();
    bench.capturer.Change([](CFakeCapturer::Answers& answers) {
        answers.sourceSize = {70, 80};
        answers.sourcePosition = {5, 6, 70, 80};
    });
    EXPECT_EQ(bench.engine->OnCapturedAppDisplayChanged(9, 5, 6, 70, 80), 0);
    EXPECT_EQ(bench.pointing->baseDisplay, 9u);
    // The first position is not remembered, so an equal one follows it.
    EXPECT_EQ(Told(), (Texts{"position 5,6 70x80", "size 70x80", "position 5,6 70x80"}));
    EXPECT_TRUE(bench.trace.Contains(Info("[CShareCaptureEngine::OnCapturedAppDisplayChanged sourceId=9")));
}

TEST_F(Notifications, OfStatisticsFillNineFieldsAndKeepTheEnginesMode) {
    SHARE_CAPTURE_STATISTIC told{1, 2, 3, 4, 5, 6, 7, 8, 9, SCREEN_CAPTURER_TYPE_CGS_GCD};
    EXPECT_EQ(bench.engine->OnCaptureStatistics(told), 0);
    const SHARE_CAPTURE_STATISTIC got = bench.Statistic();
    EXPECT_EQ(got.nTotalFrames, 1);
    EXPECT_EQ(got.m_nMsAverageCaptureTime, 2);
    EXPECT_EQ(got.m_nMsAverageDeliverCapabilityTime, 3);
    EXPECT_EQ(got.m_nMsAverageCaptureCapabilityTime, 4u);
    EXPECT_EQ(got.nCaptureWidth, 5);
    EXPECT_EQ(got.nCaptureHeight, 6);
    EXPECT_EQ(got.nCaptureFps, 7);
    EXPECT_EQ(got.nDuplicateFrames, 8);
    EXPECT_EQ(got.nFlags, 9u);
    EXPECT_EQ(got.eCaptureMode, SCREEN_CAPTURER_TYPE_DEFAULT);
    EXPECT_EQ(bench.engine->m_statistic.m_eLastMode, SCREEN_CAPTURER_TYPE_DEFAULT);
}

TEST_F(Notifications, OfThePointerStayInTheEngine) {
    bench.BeginInline();
    auto* const image = new CFakePointingImg(bench.calls, nullptr, 0, 0);
    image->AddRef();
    bench.engine->OnPointingPosChanged(3, 4);
    bench.engine->OnPointingImgChanged(image);
    EXPECT_EQ(image->GetReference(), 2u);
    bench.engine->OnPointingImgChanged(image);
    EXPECT_EQ(image->GetReference(), 2u);
    bench.engine->OnPointingImgChanged(nullptr);
    EXPECT_EQ(image->GetReference(), 1u);
    EXPECT_EQ(bench.engine->m_nPointX, 3);
    EXPECT_EQ(bench.engine->m_nPointY, 4);
    EXPECT_EQ(Told(), Texts{});
    image->Release();
}

TEST_F(Notifications, AreDroppedAfterStopUntilTheNextStartOrSink) {
    bench.Start();
    ASSERT_EQ(bench.engine->Stop(), 0);
    EXPECT_EQ(bench.engine->_GetAssistThread(), nullptr);
    EXPECT_EQ(bench.sink.Notices(), (Texts{"status 1", "status 2"}));
    bench.Forget();
    bench.engine->OnCaptureError(5);
    bench.engine->OnCaptureEvent(7, 8, nullptr);
    EXPECT_TRUE(bench.trace.Lines().empty());
    bench.engine->SetSink(&bench.sink);
    bench.engine->OnCaptureError(6);
    EXPECT_EQ(Told(), Texts{"error 6"});
}

TEST_F(Notifications, AtTheEdgeOfNumbersComeBackAsTheyWere) {
    bench.BeginInline();
    bench.engine->OnCapturePositionChanged(2147483647, -2147483647 - 1, 2147483647, -1);
    EXPECT_EQ(Told(), Texts{"position 2147483647,-2147483648 2147483647x-1"});
}

namespace {

/// A thread of whom somebody says that it has no queue.
class CQueuelessThread final : public KRNUTIL::ComTaskThread {
public:
    ICmEventQueue* GetEventQueue() override { return nullptr; }
};

} // namespace

TEST_F(Notifications, WithoutAnEventQueueAreLostWithAFailedCheck) {
    bench.BeginInline();
    const std::shared_ptr<ACmThread> assist = bench.engine->_GetAssistThread();
    bench.engine->m_pAssistThread = std::make_shared<CQueuelessThread>();
    const unsigned before = cm_assertion_count();
    bench.engine->OnCaptureError(5);
    EXPECT_EQ(cm_assertion_count(), before + 1);
    const std::vector<CTraceLog::Entry> entries = bench.trace.Entries();
    ASSERT_EQ(entries.size(), 1u);
    EXPECT_FALSE(entries[0].tag.has_value());
    const std::optional<PlacedLine> line = SplitSourcePlace(entries[0].line);
    ASSERT_TRUE(line);
    EXPECT_EQ(line->path, "src/share_capture_engine_events");
    EXPECT_EQ(line->text, "[UTIL] ERROR: src/share_capture_engine_events:" + std::to_string(line->line) +
                              " Assert failed: pEventQueue != NULL");
    bench.engine->m_pAssistThread = assist;
}

TEST(AssistThread, IsSharedByAllEnginesAndOutlivesTheStopOfOne) {
    CEngineBench<> bench;
    CCallLog calls;
    CRecordingSink otherSink(calls);
    CFakeCapturer otherCapturer(calls);
    CEngineProbe<CShareCaptureEngine> other;
    other.SetExternalIShareCapturer(&otherCapturer);
    other.SetSink(&otherSink);
    bench.Start();
    ASSERT_EQ(other.Start(), 0);
    EXPECT_EQ(bench.engine->_GetAssistThread(), other._GetAssistThread());
    EXPECT_EQ(other._GetAssistThread()->GetName(), "scn-cap-assist-{6F923E32-2392-4FE0-9F9E-BBE5C305E053}");
    EXPECT_EQ(bench.engine->Stop(), 0);
    other.OnCaptureError(5);
    EXPECT_TRUE(otherSink.WaitForNotice("error 5"));
    EXPECT_EQ(other.Stop(), 0);
}

TEST(AssistThread, TicksEveryTwoSecondsIntoNothing) {
    CEngineBench<> bench;
    bench.Start();
    bench.SettleEvents();
    bench.Forget();
    for (int i = 0; i < 5; ++i) {
        bench.Advance(2000);
        bench.SettleEvents();
    }
    EXPECT_TRUE(bench.sink.Notices().empty());
}

TEST(AssistThread, ThatCannotBeStartedLosesEventsWithoutAWord) {
    CEngineBench<> bench;
    {
        const CNoRoomForThreads noRoom;
        EXPECT_EQ(bench.engine->SetSink(&bench.sink), 0);
    }
    EXPECT_EQ(bench.engine->_GetAssistThread(), nullptr);
    bench.Forget();
    EXPECT_EQ(bench.engine->OnCaptureError(5), 0);
    EXPECT_TRUE(bench.trace.Lines().empty());
}
