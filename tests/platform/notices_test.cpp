// SPDX-License-Identifier: Apache-2.0
#include "platform/notices.h"

#include "platform/core_graphics.h"
#include "platform/platform_life.h"
#include "tests/support/call_on_thread.h"
#include "tests/support/fake_window_server.h"
#include "tests/support/give_way.h"
#include "tests/support/notice_fence.h"
#include "tests/support/test_effort.h"
#include "tests/support/threads.h"
#include "tests/support/trace_log.h"
#include "util/cm_thread.h"

#include <gtest/gtest.h>

#include <pthread.h>

#include <atomic>
#include <csignal>
#include <cstdint>
#include <iostream>
#include <memory>
#include <random>
#include <stdexcept>
#include <thread>
#include <vector>

namespace {

using namespace platform;

constexpr NoticeKinds LIFE = NoticeKindBit(NoticeKind::LifeChanged);
constexpr NoticeKinds DISPLAY = NoticeKindBit(NoticeKind::DisplayChanged);

Notice LifeNotice() {
    Notice notice;
    notice.kind = NoticeKind::LifeChanged;
    return notice;
}

class Notices : public testing::Test {
protected:
    ~Notices() override { Rest(); }

    CFakeWindowServerScope m_server;
};

} // namespace

TEST_F(Notices, StartNoThreadBeforeSomebodyIsRegistered) {
    const auto before = CountThreadsOfProcess();
    WindowServerInUse()->GetDisplays();
    EXPECT_EQ(CountThreadsOfProcess(), before);
    EXPECT_FALSE(m_server->HasReceiver());

    AddNoticeHandler(LIFE, {1, 1}, [](const Notice&) {});
    EXPECT_EQ(CountThreadsOfProcess(), before + 1);
    EXPECT_TRUE(m_server->HasReceiver());
    RemoveNoticeHandler(LIFE, {1, 1});
}

TEST_F(Notices, ReachTheHandlersOfTheirKindOnly) {
    std::atomic<int> life{0};
    std::atomic<int> both{0};
    AddNoticeHandler(LIFE, {1, 1}, [&](const Notice&) { ++life; });
    AddNoticeHandler(LIFE | NoticeKindBit(NoticeKind::ApplicationEnded), {2, 1},
                     [&](const Notice&) { ++both; });
    m_server->RaiseApplication(NoticeKind::ApplicationEnded, 7);
    m_server->RaiseApplication(NoticeKind::ApplicationLaunched, 7);
    m_server->Raise(LifeNotice());
    ASSERT_TRUE(NoticesAreDelivered(*m_server));
    EXPECT_EQ(life, 1);
    EXPECT_EQ(both, 2);
    RemoveNoticeHandler(LIFE, {1, 1});
    RemoveNoticeHandler(LIFE | NoticeKindBit(NoticeKind::ApplicationEnded), {2, 1});
}

TEST_F(Notices, KeepTheOrderInWhichTheServerToldThem) {
    std::vector<pid_t> pids;
    const NoticeKinds kinds =
        NoticeKindBit(NoticeKind::ApplicationLaunched) | NoticeKindBit(NoticeKind::ApplicationEnded);
    AddNoticeHandler(kinds, {1, 1}, [&](const Notice& notice) { pids.push_back(notice.pid); });
    for (pid_t pid = 1; pid <= 100; ++pid) {
        m_server->RaiseApplication(
            pid % 2 != 0 ? NoticeKind::ApplicationLaunched : NoticeKind::ApplicationEnded, pid);
    }
    ASSERT_TRUE(NoticesAreDelivered(*m_server));
    RemoveNoticeHandler(kinds, {1, 1});
    ASSERT_EQ(pids.size(), 100u);
    for (pid_t pid = 1; pid <= 100; ++pid)
        EXPECT_EQ(pids[static_cast<std::size_t>(pid) - 1], pid);
}

TEST_F(Notices, ComeOnAThreadThatBlocksEverySignal) {
    std::atomic<bool> allBlocked{true};
    std::atomic<bool> onCaller{false};
    AddNoticeHandler(LIFE, {1, 1}, [&, caller = std::this_thread::get_id()](const Notice&) {
        sigset_t mask;
        pthread_sigmask(SIG_SETMASK, nullptr, &mask);
        for (const int signal : {SIGINT, SIGTERM, SIGCHLD, SIGUSR1, SIGALRM})
            allBlocked = allBlocked && sigismember(&mask, signal) == 1;
        onCaller = std::this_thread::get_id() == caller;
    });
    m_server->Raise(LifeNotice());
    ASSERT_TRUE(NoticesAreDelivered(*m_server));
    EXPECT_TRUE(allBlocked);
    EXPECT_FALSE(onCaller);
    RemoveNoticeHandler(LIFE, {1, 1});
}

TEST_F(Notices, DoNotReachWhoRegistersAfterThem) {
    CGate gate;
    CTally entered;
    std::atomic<int> late{0};
    AddNoticeHandler(LIFE, {1, 1}, [&](const Notice&) {
        entered.Add();
        EXPECT_TRUE(gate.Passes());
    });
    m_server->Raise(LifeNotice());
    m_server->Raise(LifeNotice());
    ASSERT_TRUE(entered.Reaches(1));
    AddNoticeHandler(LIFE, {2, 1}, [&](const Notice&) { ++late; });
    m_server->Raise(LifeNotice());
    gate.Open();
    ASSERT_TRUE(NoticesAreDelivered(*m_server));
    EXPECT_EQ(late, 1);
    RemoveNoticeHandler(LIFE, {1, 1});
    RemoveNoticeHandler(LIFE, {2, 1});
}

TEST_F(Notices, OfADisplayComeTwiceToEachHandlerFirstAsABeginning) {
    std::vector<unsigned> flags;
    for (const std::uintptr_t who : {1u, 2u})
        AddNoticeHandler(DISPLAY, {who, 1}, [&](const Notice& notice) { flags.push_back(notice.flags); });
    m_server->RaiseDisplayChanged(5, DisplayAdded | DisplayMoved);
    ASSERT_TRUE(NoticesAreDelivered(*m_server));
    EXPECT_EQ(flags, (std::vector<unsigned>{1, 1, 18, 18}));
    RemoveNoticeHandler(DISPLAY, {1, 1});
    RemoveNoticeHandler(DISPLAY, {2, 1});
}

TEST_F(Notices, GoOnAfterAHandlerThatThrows) {
    CTraceLog log(CM_TRACE_ERROR);
    std::atomic<int> calls{0};
    AddNoticeHandler(LIFE, {1, 1}, [](const Notice&) { throw std::runtime_error("broken handler"); });
    AddNoticeHandler(LIFE, {2, 1}, [&](const Notice&) { ++calls; });
    m_server->Raise(LifeNotice());
    ASSERT_TRUE(NoticesAreDelivered(*m_server));
    EXPECT_EQ(calls, 1);
    EXPECT_EQ(log.CountContaining("broken handler"), 1u);
    RemoveNoticeHandler(LIFE, {1, 1});
    RemoveNoticeHandler(LIFE, {2, 1});
}

TEST_F(Notices, RemovalKnowsWhatIsNotRegistered) {
    EXPECT_FALSE(RemoveNoticeHandler(LIFE, {1, 1}));
    AddNoticeHandler(LIFE, {1, 1}, [](const Notice&) {});
    EXPECT_FALSE(RemoveNoticeHandler(DISPLAY, {1, 1}));
    EXPECT_FALSE(RemoveNoticeHandler(LIFE, {1, 2}));
    EXPECT_TRUE(RemoveNoticeHandler(LIFE, {1, 1}));
    EXPECT_FALSE(RemoveNoticeHandler(LIFE, {1, 1}));
}

TEST_F(Notices, RemovalWaitsForTheCallThatRuns) {
    CGate gate;
    CTally entered;
    std::atomic<bool> left{false};
    AddNoticeHandler(LIFE, {1, 1}, [&](const Notice&) {
        entered.Add();
        EXPECT_TRUE(gate.Passes());
        left = true;
    });
    m_server->Raise(LifeNotice());
    ASSERT_TRUE(entered.Reaches(1));
    bool leftWhenRemoved = false;
    CCallOnThread removal([&] {
        RemoveNoticeHandler(LIFE, {1, 1});
        leftWhenRemoved = left;
    });
    removal.UntilItWaits();
    EXPECT_FALSE(removal.HasReturned());
    gate.Open();
    ASSERT_TRUE(NoticesAreDelivered(*m_server));
    while (!removal.HasReturned())
        std::this_thread::yield();
    EXPECT_TRUE(leftWhenRemoved);
}

TEST_F(Notices, RemovalDoesNotWaitForAnotherOnesCall) {
    CGate gate;
    CTally entered;
    AddNoticeHandler(LIFE, {1, 1}, [&](const Notice&) {
        entered.Add();
        EXPECT_TRUE(gate.Passes());
    });
    AddNoticeHandler(LIFE, {2, 1}, [](const Notice&) {});
    m_server->Raise(LifeNotice());
    ASSERT_TRUE(entered.Reaches(1));
    EXPECT_TRUE(RemoveNoticeHandler(LIFE, {2, 1})); // comes back although the gate is shut
    gate.Open();
    RemoveNoticeHandler(LIFE, {1, 1});
}

TEST_F(Notices, RemovalFromInsideTheCallComesBackAndEndsTheHandlerBehindIt) {
    const auto held = std::make_shared<int>(0);
    std::atomic<bool> removed{false};
    std::atomic<long> sharesInside{0};
    AddNoticeHandler(LIFE, {1, 1}, [&, held](const Notice&) {
        removed = RemoveNoticeHandler(LIFE, {1, 1});
        sharesInside = held.use_count();
    });
    m_server->Raise(LifeNotice());
    m_server->Raise(LifeNotice());
    ASSERT_TRUE(NoticesAreDelivered(*m_server));
    EXPECT_TRUE(removed);
    EXPECT_EQ(sharesInside, 2);
    EXPECT_EQ(held.use_count(), 1);
}

TEST_F(Notices, RemovalWaitsAlsoForACallThatHasRemovedItself) {
    CGate gate;
    CTally removedItself;
    AddNoticeHandler(LIFE, {1, 1}, [&](const Notice&) {
        EXPECT_TRUE(RemoveNoticeHandler(LIFE, {1, 1}));
        removedItself.Add();
        EXPECT_TRUE(gate.Passes());
    });
    m_server->Raise(LifeNotice());
    ASSERT_TRUE(removedItself.Reaches(1));
    bool found = true;
    CCallOnThread removal([&] { found = RemoveNoticeHandler(LIFE, {1, 1}); });
    removal.UntilItWaits();
    EXPECT_FALSE(removal.HasReturned());
    EXPECT_FALSE(RemoveNoticeHandler(LIFE, {2, 1})) << "others don't wait";
    gate.Open();
    while (!removal.HasReturned())
        std::this_thread::yield();
    EXPECT_FALSE(found);
}

TEST_F(Notices, RemovalEndsTheHandlerBeforeItReturns) {
    const auto held = std::make_shared<int>(0);
    AddNoticeHandler(LIFE, {1, 1}, [held](const Notice&) {});
    m_server->Raise(LifeNotice());
    RemoveNoticeHandler(LIFE, {1, 1});
    EXPECT_EQ(held.use_count(), 1);
}

TEST_F(Notices, RemovalTouchesNoServer) {
    AddNoticeHandler(LIFE, {1, 1}, [](const Notice&) {});
    const int receivers = m_server->calls.receivers;
    const long shares = m_server.Share().use_count();
    RemoveNoticeHandler(LIFE, {1, 1});
    EXPECT_EQ(m_server->calls.receivers, receivers);
    EXPECT_EQ(m_server.Share().use_count(), shares);
}

TEST_F(Notices, HandlersMayRegisterAndRemoveOthers) {
    CTally second;
    AddNoticeHandler(LIFE, {1, 1}, [&](const Notice&) {
        AddNoticeHandler(LIFE, {2, 1}, [&](const Notice&) { second.Add(); });
        RemoveNoticeHandler(LIFE, {1, 1});
    });
    m_server->Raise(LifeNotice());
    ASSERT_TRUE(NoticesAreDelivered(*m_server));
    EXPECT_EQ(second.Count(), 0);
    m_server->Raise(LifeNotice());
    EXPECT_TRUE(second.Reaches(1));
    RemoveNoticeHandler(LIFE, {2, 1});
}

TEST_F(Notices, FollowAServerThatReplacesTheOldOne) {
    CTally calls;
    AddNoticeHandler(LIFE, {1, 1}, [&](const Notice&) { calls.Add(); });
    {
        const CFakeWindowServerScope next;
        EXPECT_FALSE(m_server->HasReceiver());
        EXPECT_TRUE(next->HasReceiver());
        next->Raise(LifeNotice());
        EXPECT_TRUE(calls.Reaches(1));
    }
    EXPECT_TRUE(m_server->HasReceiver());
    m_server->Raise(LifeNotice());
    EXPECT_TRUE(calls.Reaches(2));
    RemoveNoticeHandler(LIFE, {1, 1});
}

TEST_F(Notices, LetGoOfAReplacedServer) {
    AddNoticeHandler(LIFE, {1, 1}, [](const Notice&) {});
    std::weak_ptr<CFakeWindowServer> watched;
    {
        const CFakeWindowServerScope passing;
        watched = passing.Share();
    }
    EXPECT_TRUE(watched.expired());
    RemoveNoticeHandler(LIFE, {1, 1});
    ReplaceWindowServer(ReplaceWindowServer(nullptr)); // with nobody registered: chooses none anew
    EXPECT_FALSE(m_server->HasReceiver());
}

TEST_F(Notices, ComeOnceAThreadCanBeStarted) {
    CTally calls;
    {
        const CNoNewThreadsScope noThreads;
        EXPECT_TRUE(AddNoticeHandler(LIFE, {1, 1}, [&](const Notice&) { calls.Add(); }));
        EXPECT_FALSE(m_server->HasReceiver());
    }
    CGMainDisplayID(); // any use of the platform tries again
    EXPECT_TRUE(m_server->HasReceiver());
    m_server->Raise(LifeNotice());
    EXPECT_TRUE(calls.Reaches(1));
    RemoveNoticeHandler(LIFE, {1, 1});
}

namespace {

/// Lives only while it is registered: a call after its removal is one on freed memory, which the sanitizers
/// see, or on a corpse, which every build sees.
class Listener {
public:
    explicit Listener(std::atomic<int>& callsOnTheDead) : m_callsOnTheDead(callsOnTheDead) {
        CGDisplayRegisterReconfigurationCallback(OnChange, this);
    }
    ~Listener() {
        CGDisplayRemoveReconfigurationCallback(OnChange, this);
        m_alive = ~ALIVE;
    }
    Listener(const Listener&) = delete;
    Listener& operator=(const Listener&) = delete;

    /// Gives up after a while: a rest may have left nobody who calls.
    bool WaitsUntilCalled() const {
        for (int i = 0; i < 2000 && !m_entered; ++i)
            std::this_thread::yield();
        return m_entered;
    }

    /// From now on it removes itself inside a call.
    bool removesItself = false;

private:
    static constexpr unsigned ALIVE = 0x600DF00D;

    static void OnChange(CGDirectDisplayID, unsigned, void* userInfo) {
        auto* const self = static_cast<Listener*>(userInfo);
        if (self->m_alive != ALIVE)
            ++self->m_callsOnTheDead;
        self->m_entered = true;
        self->m_calls = self->m_calls + 1; // not atomic: a call beside the destructor is a race
        for (int i = 0; i < 20 && self->m_alive == ALIVE; ++i)
            std::this_thread::yield();
        if (self->m_alive != ALIVE)
            ++self->m_callsOnTheDead;
        if (self->removesItself)
            CGDisplayRemoveReconfigurationCallback(OnChange, self);
    }

    std::atomic<int>& m_callsOnTheDead;
    std::atomic<bool> m_entered{false};
    // Volatile: what a broken removal does to them must not be optimised away.
    volatile unsigned m_alive = ALIVE;
    volatile int m_calls = 0;
};

} // namespace

TEST_F(Notices, RegistrationsRaceWithNoticesReplacementsAndRests) {
    const int rounds = TestRounds(500);
    const unsigned seed = std::random_device{}();
    std::cout << rounds << " rounds, seed " << seed << '\n';

    std::atomic<int> callsOnTheDead{0};
    std::atomic<bool> done{false};
    std::atomic<int> calls{0};
    std::atomic<int> endedInTheirCall{0};
    AddNoticeHandler(DISPLAY, {99, 0}, [&](const Notice&) { ++calls; });
    std::vector<std::thread> threads;
    for (unsigned i = 0; i < 3; ++i) {
        threads.emplace_back([&, i] {
            std::mt19937 random(seed + i);
            for (int round = 0; round < rounds; ++round) {
                std::vector<std::unique_ptr<Listener>> listeners;
                for (auto n = random() % 4 + 1; n > 0; --n) {
                    listeners.push_back(std::make_unique<Listener>(callsOnTheDead));
                    if (random() % 8 == 0)
                        CGMainDisplayID();
                }
                if (random() % 2 == 0 && listeners.back()->WaitsUntilCalled())
                    ++endedInTheirCall;
            }
        });
    }
    std::thread raising([&] {
        while (!done) {
            if (const auto server = std::dynamic_pointer_cast<CFakeWindowServer>(CurrentWindowServer()))
                server->RaiseDisplayChanged(1, DisplayMoved);
            std::this_thread::yield();
        }
    });
    std::thread replacing([&] {
        std::mt19937 random(seed + 100);
        while (!done) {
            if (random() % 2 != 0) {
                const CFakeWindowServerScope passing;
                std::this_thread::yield();
            } else {
                Rest();
            }
            Wake();
            GiveWay(random() % 2000);
        }
    });
    for (std::thread& thread : threads)
        thread.join();
    done = true;
    raising.join();
    replacing.join();
    EXPECT_EQ(callsOnTheDead, 0);
    EXPECT_GT(calls, 0);
    EXPECT_GT(endedInTheirCall, 0);
    std::cout << endedInTheirCall << " ended in or behind their call\n";

    Wake();
    ASSERT_TRUE(NoticesAreDelivered(*m_server));
    const int before = calls;
    m_server->RaiseDisplayChanged(1, DisplayMoved);
    ASSERT_TRUE(NoticesAreDelivered(*m_server));
    EXPECT_EQ(calls, before + 2) << "who stayed registered still hears of the server in force";
    RemoveNoticeHandler(DISPLAY, {99, 0});
}

TEST_F(Notices, RegistrationsThatEndThemselvesRaceWithTheirRemoval) {
    const int rounds = TestRounds(2000);
    std::cout << rounds << " rounds\n";
    std::atomic<int> callsOnTheDead{0};
    int endedInTheirCall = 0;
    for (int round = 0; round < rounds; ++round) {
        Listener listener(callsOnTheDead);
        listener.removesItself = true;
        m_server->RaiseDisplayChanged(1, DisplayMoved);
        if (round % 4 != 0 && listener.WaitsUntilCalled())
            ++endedInTheirCall;
    }
    EXPECT_EQ(callsOnTheDead, 0);
    EXPECT_GT(endedInTheirCall, 0);
}
