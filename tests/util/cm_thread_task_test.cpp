// SPDX-License-Identifier: Apache-2.0
#include "tests/support/threads.h"
#include "tests/support/trace_log.h"
#include "util/cm_thread.h"

#include <gtest/gtest.h>

#include <functional>
#include <memory>
#include <stdexcept>
#include <string>
#include <thread>

namespace {

/// A task thread whose start and run a test may break.
class BrokenTaskThread final : public KRNUTIL::ComTaskThread {
public:
    int OnThreadInit() override {
        EXPECT_EQ(ComTaskThread::OnThreadInit(), 0);
        m_afterInit();
        return m_initResult;
    }
    int OnThreadRun() override {
        m_beforeRun();
        const int result = ComTaskThread::OnThreadRun();
        m_afterRun();
        return result;
    }

    std::function<void()> m_afterInit = [] {};
    std::function<void()> m_beforeRun = [] {};
    std::function<void()> m_afterRun = [] {};
    int m_initResult = 0;
};

} // namespace

TEST(ComTaskThread, HasItsQueuesFromItsInitialisationOn) {
    const auto thread = std::make_shared<KRNUTIL::ComTaskThread>();
    EXPECT_EQ(thread->GetEventQueue(), nullptr);
    EXPECT_EQ(thread->GetTimerQueue(), nullptr);
    ASSERT_EQ(thread->Create("queues", 1, 1, 0), 0);
    EXPECT_NE(thread->GetEventQueue(), nullptr);
    EXPECT_NE(thread->GetTimerQueue(), nullptr);
    thread->Destory(0);
    EXPECT_EQ(Post(*thread, [] {}), -1);
}

TEST(ComTaskThread, FiresEventsOnItself) {
    CRunningThread thread;
    CmThreadId posted = 0;
    CmThreadId sent = 0;
    EXPECT_EQ(Post(*thread, [&] { posted = GetThreadSelfId(); }), 0);
    EXPECT_EQ(Send(*thread, [&] { sent = GetThreadSelfId(); }), 0);
    EXPECT_EQ(posted, thread->GetThreadId());
    EXPECT_EQ(sent, thread->GetThreadId());
}

TEST(ComTaskThread, FiresAnEventSentFromItselfInline) {
    CRunningThread thread;
    std::string order;
    Post(*thread, [&] {
        Post(*thread, [&] { order += "posted "; });
        EXPECT_EQ(Send(*thread, [&] { order += "sent "; }), 0);
        order += "on ";
    });
    Settle(*thread);
    Settle(*thread); // the first may have come before the posted event
    EXPECT_EQ(order, "sent on posted ");
}

TEST(ComTaskThread, FiresWhatWasTakenBeforeItStoppedAndRefusesTheRest) {
    CRunningThread thread;
    std::string order;
    CGate gate;
    Post(*thread, [&] { EXPECT_TRUE(gate.Passes()); });
    EXPECT_EQ(Post(
                  *thread, [&] { order += "low "; }, CM_EVENT_PRIORITY_LOW),
              0);
    EXPECT_EQ(Post(*thread, [&] { order += "first "; }), 0);
    EXPECT_EQ(Post(*thread,
                   [&] {
                       order += "second ";
                       EXPECT_EQ(Send(*thread, [&] { order += "refused "; }), -1);
                   }),
              0);
    EXPECT_EQ(thread->Stop(nullptr), 0);
    EXPECT_TRUE(thread->GetStopFlag());
    auto guest = std::make_shared<int>(0);
    EXPECT_EQ(Post(*thread, [&order, guest] { order += "refused "; }), -1);
    EXPECT_EQ(Send(*thread, [&order, guest] { order += "refused "; }), -1);
    EXPECT_EQ(guest.use_count(), 1) << "a refused event must not live on";
    gate.Open();
    EXPECT_EQ(thread->Join(), 0);
    EXPECT_EQ(order, "first second low ");
}

TEST(ComTaskThread, FiresTheEventsOfAStartThatFailed) {
    const auto thread = std::make_shared<BrokenTaskThread>();
    bool posted = false;
    thread->m_initResult = -1;
    thread->m_afterInit = [&] { EXPECT_EQ(Post(*thread, [&] { posted = true; }), 0); };
    EXPECT_EQ(thread->Create("broken", 1, 1), -1);
    EXPECT_TRUE(posted);
    EXPECT_EQ(Post(*thread, [] {}), -1);
    EXPECT_EQ(Send(*thread, [] {}), -1);
}

TEST(ComTaskThread, LeavesNobodyWaitingWhenItsRunThrows) {
    const CTraceLog log(CM_TRACE_ERROR);
    const auto thread = std::make_shared<BrokenTaskThread>();
    CGate gate;
    thread->m_beforeRun = [&] {
        EXPECT_TRUE(gate.Passes());
        throw std::runtime_error("no table");
    };
    ASSERT_EQ(thread->Create("broken", 1, 1), 0);
    bool posted = false;
    EXPECT_EQ(Post(*thread, [&] { posted = true; }), 0);
    std::thread opener([&] { gate.Open(); });
    // Taken or refused, as the end comes late or early: but it comes back.
    Send(*thread, [] {});
    opener.join();
    EXPECT_EQ(thread->Join(), 0);
    EXPECT_TRUE(posted);
    EXPECT_EQ(log.Lines().size(), 1u);
}

TEST(ComTaskThread, GoesOnAfterAnEventThatThrew) {
    const CTraceLog log(CM_TRACE_ERROR);
    CRunningThread thread;
    Post(*thread, [] { throw std::runtime_error("no paper"); });
    bool next = false;
    Send(*thread, [&] { next = true; });
    EXPECT_TRUE(next);
    EXPECT_EQ(log.Lines().size(), 1u);
}

TEST(ComTaskThread, EndsWhenItIsToldToInsideAnEvent) {
    CRunningThread thread;
    bool later = false;
    Post(*thread, [&] {
        Post(*thread, [&] { later = true; });
        EXPECT_EQ(thread->Stop(nullptr), 0);
        EXPECT_EQ(thread->Join(), -1);
        EXPECT_EQ(thread->Destory(0), -1);
    });
    EXPECT_EQ(thread->Join(), 0);
    EXPECT_TRUE(later);
}

TEST(ComTaskThread, LeavesItsLoopOnlyWhenItHasFiredAllThatWasTaken) {
    const auto thread = std::make_shared<BrokenTaskThread>();
    CGate gate;
    int fired = 0;
    int firedInLoop = 0;
    thread->m_afterRun = [&] { firedInLoop = fired; };
    ASSERT_EQ(thread->Create("draining", 1, 1), 0);
    Post(*thread, [&] { EXPECT_TRUE(gate.Passes()); });
    for (int i = 0; i < 5; ++i)
        EXPECT_EQ(Post(*thread, [&] { ++fired; }), 0);
    thread->Stop(nullptr);
    gate.Open();
    EXPECT_EQ(thread->Join(), 0);
    EXPECT_EQ(firedInLoop, 5);
}

TEST(ComTaskThread, EndsWhenItIsToldToDuringItsInitialisation) {
    const auto thread = std::make_shared<BrokenTaskThread>();
    bool posted = false;
    thread->m_afterInit = [&] {
        EXPECT_EQ(Post(*thread, [&] { posted = true; }), 0);
        EXPECT_EQ(thread->Stop(nullptr), 0);
        EXPECT_EQ(Post(*thread, [] {}), -1);
    };
    EXPECT_EQ(thread->Create("stopped", 1, 1), 0);
    EXPECT_EQ(thread->Join(), 0);
    EXPECT_TRUE(posted);
}

TEST(ComTaskThread, EndsWhenOnlyItsStopFlagIsSet) {
    CRunningThread thread;
    thread->SetStop();
    EXPECT_EQ(thread->Join(), 0);
    EXPECT_EQ(Send(*thread, [] {}), -1);
}

TEST(ComTaskThread, LeavesNoThreadBehind) {
    { CRunningThread first; } // a sanitizer may start a thread of its own with the first one
    const std::ptrdiff_t threads = CountThreadsOfProcess();
    for (int cycle = 0; cycle < 200; ++cycle) {
        const auto thread = std::make_shared<KRNUTIL::ComTaskThread>();
        ASSERT_EQ(thread->Create("cycle", 1, 1), 0);
        int fired = 0;
        EXPECT_EQ(Send(*thread, [&] { ++fired; }), 0);
        EXPECT_EQ(fired, 1);
        EXPECT_EQ(thread->Stop(nullptr), 0);
        EXPECT_EQ(thread->Join(), 0);
        EXPECT_EQ(thread.use_count(), 1);
    }
    EXPECT_TRUE(ThreadsComeDownTo(threads));
}
