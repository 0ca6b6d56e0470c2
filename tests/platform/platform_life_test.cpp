// SPDX-License-Identifier: Apache-2.0
#include "platform/platform_life.h"

#include "platform/app_kit.h"
#include "platform/core_graphics.h"
#include "platform/dispatch.h"
#include "platform/notices.h"
#include "tests/support/call_on_thread.h"
#include "tests/support/fake_window_server.h"
#include "tests/support/notice_fence.h"
#include "tests/support/threads.h"
#include "tests/support/trace_log.h"

#include <gtest/gtest.h>

#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <cstddef>
#include <cstdlib>
#include <thread>

namespace {

using namespace platform;

constexpr NoticeKinds LIFE = NoticeKindBit(NoticeKind::LifeChanged);

Notice LifeNotice() {
    Notice notice;
    notice.kind = NoticeKind::LifeChanged;
    return notice;
}

class PlatformLife : public testing::Test {
protected:
    ~PlatformLife() override { Rest(); }

    /// Both the notice thread and the pool are there after it.
    void StartAll() {
        AddNoticeHandler(LIFE, {1, 1}, [this](const Notice&) { m_notices.Add(); });
        const int before = m_blocks.Count();
        dispatch_async(m_queue, [this] { m_blocks.Add(); });
        ASSERT_TRUE(m_blocks.Reaches(before + 1));
    }

    CFakeWindowServerScope m_server;
    const std::ptrdiff_t m_threadsBefore = CountThreadsOfProcess();
    const dispatch_queue_t m_queue = dispatch_queue_create("", DISPATCH_QUEUE_CONCURRENT);
    CTally m_notices;
    CTally m_blocks;
};

} // namespace

TEST_F(PlatformLife, NoThreadIsLeftAfterARest) {
    StartAll();
    EXPECT_EQ(CountThreadsOfProcess(), m_threadsBefore + 2);
    Rest();
    EXPECT_TRUE(ThreadsComeDownTo(m_threadsBefore));
    EXPECT_FALSE(m_server->HasReceiver());
    EXPECT_EQ(m_server->calls.rests, 1);
    RemoveNoticeHandler(LIFE, {1, 1});
}

TEST_F(PlatformLife, ARestTracesNothing) {
    StartAll();
    CTraceLog log;
    Rest();
    Rest();
    EXPECT_TRUE(log.Lines().empty());
    RemoveNoticeHandler(LIFE, {1, 1});
}

TEST_F(PlatformLife, ARestDeliversWhatWaits) {
    CGate gate;
    CTally entered;
    std::atomic<int> ran{0};
    AddNoticeHandler(LIFE, {1, 1}, [&](const Notice&) {
        entered.Add();
        EXPECT_TRUE(gate.Passes());
        dispatch_async(m_queue, [&] { ++ran; });
    });
    for (int i = 0; i < 3; ++i)
        m_server->Raise(LifeNotice());
    ASSERT_TRUE(entered.Reaches(1));
    CCallOnThread rest([] { Rest(); });
    rest.UntilItWaits();
    EXPECT_FALSE(rest.HasReturned());
    gate.Open();
    while (!rest.HasReturned())
        std::this_thread::yield();
    EXPECT_EQ(entered.Count(), 3);
    EXPECT_EQ(ran, 3);
    RemoveNoticeHandler(LIFE, {1, 1});
}

TEST_F(PlatformLife, TheNextCallStartsAnewWhatRegistrationsNeed) {
    StartAll();
    Rest();
    EXPECT_TRUE(ThreadsComeDownTo(m_threadsBefore));
    CGMainDisplayID();
    EXPECT_TRUE(m_server->HasReceiver());
    m_server->Raise(LifeNotice());
    EXPECT_TRUE(m_notices.Reaches(1));
    RemoveNoticeHandler(LIFE, {1, 1});
}

TEST_F(PlatformLife, WakingStartsNothingForNobody) {
    StartAll();
    RemoveNoticeHandler(LIFE, {1, 1});
    Rest();
    Wake();
    CGMainDisplayID();
    EXPECT_TRUE(ThreadsComeDownTo(m_threadsBefore));
    EXPECT_FALSE(m_server->HasReceiver());
}

TEST_F(PlatformLife, WakingServesRegistrationsThatARestLeft) {
    StartAll();
    Rest();
    Wake();
    m_server->Raise(LifeNotice());
    EXPECT_TRUE(m_notices.Reaches(1));
    RemoveNoticeHandler(LIFE, {1, 1});
}

TEST_F(PlatformLife, DispatchingAfterARestStartsAnew) {
    StartAll();
    Rest();
    CTally ran;
    dispatch_async(m_queue, [&] { ran.Add(); });
    EXPECT_TRUE(ran.Reaches(1));
    Rest(); // the block uses what ends here
    RemoveNoticeHandler(LIFE, {1, 1});
}

TEST_F(PlatformLife, WhatIsCalledDuringARestKeepsNothingAwake) {
    CGate handlerGate;
    CGate blockGate;
    CTally entered;
    CTally blockDone;
    // What an enumerator does: it registers for a moment and looks around.
    const auto lookAround = [] {
        AddNoticeHandler(LIFE, {2, 1}, [](const Notice&) {});
        CGMainDisplayID();
        RemoveNoticeHandler(LIFE, {2, 1});
        NSScreen::screens();
    };
    AddNoticeHandler(LIFE, {1, 1}, [&](const Notice&) {
        entered.Add();
        EXPECT_TRUE(handlerGate.Passes());
        lookAround();
    });
    dispatch_async(m_queue, [&] {
        entered.Add();
        EXPECT_TRUE(blockGate.Passes());
        lookAround();
        blockDone.Add();
    });
    m_server->Raise(LifeNotice());
    ASSERT_TRUE(entered.Reaches(2));
    {
        CCallOnThread rest([] { Rest(); });
        rest.UntilItWaits(); // for the handler: the pool has not been told to end yet
        blockGate.Open();
        EXPECT_TRUE(blockDone.Reaches(1));
        handlerGate.Open();
    }
    EXPECT_TRUE(ThreadsComeDownTo(m_threadsBefore));
    EXPECT_FALSE(m_server->HasReceiver());
    RemoveNoticeHandler(LIFE, {1, 1});
}

TEST_F(PlatformLife, ARestInsideAHandlerDoesNotWaitAndItsThreadEnds) {
    CTally rested;
    AddNoticeHandler(LIFE, {1, 1}, [&](const Notice&) {
        Rest();
        CGMainDisplayID(); // still in the callback: starts nothing anew
        rested.Add();
    });
    m_server->Raise(LifeNotice());
    ASSERT_TRUE(rested.Reaches(1));
    EXPECT_TRUE(ThreadsComeDownTo(m_threadsBefore));
    EXPECT_FALSE(m_server->HasReceiver());
    RemoveNoticeHandler(LIFE, {1, 1});
}

TEST_F(PlatformLife, ARestInsideABlockDoesNotWaitAndItsThreadEnds) {
    StartAll();
    CTally rested;
    dispatch_async(m_queue, [&] {
        Rest();
        rested.Add();
    });
    ASSERT_TRUE(rested.Reaches(1));
    EXPECT_TRUE(ThreadsComeDownTo(m_threadsBefore));
    RemoveNoticeHandler(LIFE, {1, 1});
}

TEST_F(PlatformLife, AHandlerThatRestedLeavesTheNextThreadItsTurn) {
    CGate gate;
    CTally entered;
    std::atomic<int> inside{0};
    std::atomic<bool> alone{true};
    AddNoticeHandler(LIFE, {1, 1}, [&](const Notice&) {
        alone = alone && ++inside == 1;
        if (entered.Count() == 0)
            Rest();
        entered.Add();
        EXPECT_TRUE(gate.Passes());
        --inside;
    });
    m_server->Raise(LifeNotice());
    ASSERT_TRUE(entered.Reaches(1));
    Wake(); // the old thread is still in the call
    m_server->Raise(LifeNotice());
    m_server->Raise(LifeNotice());
    gate.Open();
    EXPECT_TRUE(entered.Reaches(3));
    ASSERT_TRUE(NoticesAreDelivered(*m_server));
    EXPECT_TRUE(alone);
    RemoveNoticeHandler(LIFE, {1, 1});
}

TEST_F(PlatformLife, ARestWithoutAWindowServerMakesNone) {
    ReplaceWindowServer(nullptr);
    CTraceLog log;
    setenv("SCREENSHARE_PLATFORM", "no such kind", 1); // the choice would be traced
    Rest();
    EXPECT_EQ(ChosenWindowServer(), nullptr);
    EXPECT_TRUE(log.Lines().empty());
    unsetenv("SCREENSHARE_PLATFORM");
}

TEST_F(PlatformLife, ManyMayRestAtOnce) {
    for (int round = 0; round < 20; ++round) {
        StartAll();
        std::thread one([] { Rest(); });
        std::thread other([] { Rest(); });
        one.join();
        other.join();
        EXPECT_TRUE(ThreadsComeDownTo(m_threadsBefore));
        RemoveNoticeHandler(LIFE, {1, 1});
    }
}

TEST_F(PlatformLife, AForkedChildFindsNoLockTakenAndNothingToWaitFor) {
    // The notice thread sits in a handler and a pool thread in a block while the process forks.
    CGate gate;
    CTally entered;
    const auto sit = [&] {
        entered.Add();
        EXPECT_TRUE(gate.Passes());
    };
    AddNoticeHandler(LIFE, {1, 1}, [&](const Notice&) { sit(); });
    dispatch_async(m_queue, sit);
    m_server->Raise(LifeNotice());
    ASSERT_TRUE(entered.Reaches(2));
    const pid_t child = fork();
    if (child == 0) {
        alarm(20);
        RemoveNoticeHandler(LIFE, {1, 1});
        NSScreen::screens();
        NSCursor::currentSystemCursor();
        Rest();
        _exit(0);
    }
    ASSERT_GT(child, 0);
    int status = 0;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0) << status;
    gate.Open();
    RemoveNoticeHandler(LIFE, {1, 1});
    Rest(); // the block uses what ends here
}

TEST_F(PlatformLife, AProcessMayEndWithoutARest) {
    // In a child of its own, which starts its own threads and leaves by exit. Not a fork of this process,
    // whose other threads may hold any lock.
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    EXPECT_EXIT(
        {
            AddNoticeHandler(LIFE, {1, 1}, [](const Notice&) {});
            CTally ran;
            const dispatch_queue_t queue = dispatch_queue_create("", DISPATCH_QUEUE_SERIAL);
            dispatch_async(queue, [&ran] { ran.Add(); });
            const bool good = ran.Reaches(1) && CountThreadsOfProcess() > 1;
            std::exit(good ? 3 : 4);
        },
        testing::ExitedWithCode(3), "");
}
