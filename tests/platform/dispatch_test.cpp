// SPDX-License-Identifier: Apache-2.0
#include "platform/dispatch.h"

#include "platform/platform_life.h"
#include "tests/support/test_effort.h"
#include "tests/support/threads.h"
#include "tests/support/trace_log.h"

#include <gtest/gtest.h>

#include <pthread.h>

#include <atomic>
#include <csignal>
#include <cstddef>
#include <functional>
#include <iostream>
#include <memory>
#include <mutex>
#include <random>
#include <set>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

namespace {

using namespace platform;

class Dispatch : public testing::Test {
protected:
    ~Dispatch() override { Rest(); }
};

/// Made behind what blocks use, so that they are over before it goes.
struct RestAtEnd {
    ~RestAtEnd() { Rest(); }
};

void AddOne(void* tally) {
    static_cast<CTally*>(tally)->Add();
}

} // namespace

TEST_F(Dispatch, QueuesBearTheirLabel) {
    std::string label = "qvn.test";
    const dispatch_queue_t queue = dispatch_queue_create(label.c_str(), DISPATCH_QUEUE_SERIAL);
    label = "changed!";
    EXPECT_STREQ(dispatch_queue_get_label(queue), "qvn.test");
    EXPECT_STREQ(dispatch_queue_get_label(dispatch_queue_create(nullptr, DISPATCH_QUEUE_SERIAL)), "");
}

TEST_F(Dispatch, NoQueueTakesNothingAndHoldsNothing) {
    dispatch_queue_t none;
    bool ran = false;
    dispatch_async(none, [&] { ran = true; });
    dispatch_set_context(none, this);
    dispatch_set_finalizer_f(none, AddOne);
    dispatch_release(none);
    EXPECT_EQ(dispatch_get_context(none), nullptr);
    EXPECT_STREQ(dispatch_queue_get_label(none), "");
    Rest();
    EXPECT_FALSE(ran);
}

TEST_F(Dispatch, ABlockWithoutAFunctionIsNone) {
    const dispatch_queue_t queue = dispatch_queue_create("", DISPATCH_QUEUE_SERIAL);
    const auto before = CountThreadsOfProcess();
    dispatch_async(queue, nullptr);
    EXPECT_EQ(CountThreadsOfProcess(), before);
}

TEST_F(Dispatch, BlocksRunOnAnotherThreadThatBlocksEverySignal) {
    const dispatch_queue_t queue = dispatch_queue_create("", DISPATCH_QUEUE_CONCURRENT);
    CTally ran;
    std::atomic<bool> elsewhere{false};
    std::atomic<bool> blocked{true};
    const RestAtEnd rest;
    dispatch_async(queue, [&, caller = std::this_thread::get_id()] {
        elsewhere = std::this_thread::get_id() != caller;
        sigset_t mask;
        pthread_sigmask(SIG_SETMASK, nullptr, &mask);
        for (const int signal : {SIGINT, SIGTERM, SIGCHLD, SIGUSR1, SIGALRM})
            blocked = blocked && sigismember(&mask, signal) == 1;
        ran.Add();
    });
    ASSERT_TRUE(ran.Reaches(1));
    EXPECT_TRUE(elsewhere);
    EXPECT_TRUE(blocked);
}

TEST_F(Dispatch, ASerialQueueRunsOneBlockAtATimeInOrder) {
    const dispatch_queue_t queue = dispatch_queue_create("", DISPATCH_QUEUE_SERIAL);
    const dispatch_queue_t noise = dispatch_queue_create("", DISPATCH_QUEUE_CONCURRENT);
    std::vector<int> order; // touched by blocks of the serial queue only, so no lock
    std::atomic<int> inside{0};
    std::atomic<bool> alone{true};
    for (int i = 0; i < 500; ++i) {
        dispatch_async(queue, [&, i] {
            alone = alone && ++inside == 1;
            order.push_back(i);
            std::this_thread::yield();
            --inside;
        });
        dispatch_async(noise, [] { std::this_thread::yield(); });
    }
    Rest();
    EXPECT_TRUE(alone);
    ASSERT_EQ(order.size(), 500u);
    for (int i = 0; i < 500; ++i)
        EXPECT_EQ(order[static_cast<std::size_t>(i)], i);
}

TEST_F(Dispatch, AConcurrentQueueRunsBlocksBesideEachOther) {
    const dispatch_queue_t queue = dispatch_queue_create("", DISPATCH_QUEUE_CONCURRENT);
    CTally together;
    CTally met;
    const RestAtEnd rest;
    for (int i = 0; i < 5; ++i) {
        dispatch_async(queue, [&] {
            together.Add();
            if (together.Reaches(5))
                met.Add();
        });
    }
    EXPECT_TRUE(met.Reaches(5));
}

TEST_F(Dispatch, OneSerialQueueDoesNotHoldUpAnother) {
    const dispatch_queue_t stuck = dispatch_queue_create("", DISPATCH_QUEUE_SERIAL);
    const dispatch_queue_t free = dispatch_queue_create("", DISPATCH_QUEUE_SERIAL);
    CGate gate;
    CTally ran;
    const RestAtEnd rest;
    dispatch_async(stuck, [&] { EXPECT_TRUE(gate.Passes()); });
    dispatch_async(free, [&] { ran.Add(); });
    EXPECT_TRUE(ran.Reaches(1));
    gate.Open();
}

TEST_F(Dispatch, ThePoolHasABound) {
    const auto before = CountThreadsOfProcess();
    const dispatch_queue_t queue = dispatch_queue_create("", DISPATCH_QUEUE_CONCURRENT);
    CGate gate;
    CTally entered;
    CTally left;
    const RestAtEnd rest;
    for (int i = 0; i < 3 * DISPATCH_POOL_THREADS; ++i) {
        dispatch_async(queue, [&] {
            entered.Add();
            EXPECT_TRUE(gate.Passes());
            left.Add();
        });
    }
    ASSERT_TRUE(entered.Reaches(DISPATCH_POOL_THREADS));
    EXPECT_EQ(CountThreadsOfProcess(), before + DISPATCH_POOL_THREADS);
    EXPECT_EQ(entered.Count(), DISPATCH_POOL_THREADS);
    gate.Open();
    EXPECT_TRUE(left.Reaches(3 * DISPATCH_POOL_THREADS));
}

TEST_F(Dispatch, ThreadsAreUsedAgain) {
    const dispatch_queue_t queue = dispatch_queue_create("", DISPATCH_QUEUE_CONCURRENT);
    CTally ran;
    std::mutex mutex;
    std::set<std::thread::id> threads; // guarded by mutex
    const RestAtEnd rest;
    for (int i = 1; i <= 200; ++i) {
        dispatch_async(queue, [&] {
            const std::lock_guard<std::mutex> lock(mutex);
            threads.insert(std::this_thread::get_id());
            ran.Add();
        });
        ASSERT_TRUE(ran.Reaches(i));
    }
    const std::lock_guard<std::mutex> lock(mutex);
    EXPECT_LE(threads.size(), static_cast<std::size_t>(DISPATCH_POOL_THREADS));
}

TEST_F(Dispatch, GoesOnAfterABlockThatThrows) {
    CTraceLog log(CM_TRACE_ERROR);
    for (const dispatch_queue_attr_t attribute : {DISPATCH_QUEUE_SERIAL, DISPATCH_QUEUE_CONCURRENT}) {
        const dispatch_queue_t queue = dispatch_queue_create("", attribute);
        CTally ran;
        const RestAtEnd rest;
        dispatch_async(queue, [] { throw std::runtime_error("broken block"); });
        dispatch_async(queue, [&] { ran.Add(); });
        EXPECT_TRUE(ran.Reaches(1));
    }
    Rest();
    EXPECT_EQ(log.CountContaining("broken block"), 2u);
}

TEST_F(Dispatch, BlocksKeepTheQueueAndWhatTheyHoldEndsBehindThem) {
    for (const dispatch_queue_attr_t attribute : {DISPATCH_QUEUE_SERIAL, DISPATCH_QUEUE_CONCURRENT}) {
        CGate gate;
        CTally entered;
        CTally ran;
        const auto held = std::make_shared<int>(0);
        const RestAtEnd rest;
        {
            dispatch_queue_t queue = dispatch_queue_create("", attribute);
            dispatch_async(queue, [&] {
                entered.Add();
                EXPECT_TRUE(gate.Passes());
            });
            ASSERT_TRUE(entered.Reaches(1));
            for (int i = 0; i < 10; ++i)
                dispatch_async(queue, [&ran, held] { ran.Add(); });
            dispatch_release(queue);
            EXPECT_EQ(queue, nullptr);
        }
        gate.Open();
        EXPECT_TRUE(ran.Reaches(10));
        Rest();
        EXPECT_EQ(held.use_count(), 1);
    }
}

TEST_F(Dispatch, TheFinaliserRunsOnceWithTheContextBehindTheLastBlock) {
    struct Context {
        std::atomic<int> blocks{0};
        int blocksWhenFinalised = -1;
        std::thread::id finaliser;
        CTally finalised;
    } context;
    CGate gate;
    const RestAtEnd rest;
    dispatch_queue_t queue = dispatch_queue_create("", DISPATCH_QUEUE_SERIAL);
    dispatch_set_context(queue, &context);
    dispatch_set_finalizer_f(queue, [](void* pointer) {
        auto* const self = static_cast<Context*>(pointer);
        self->blocksWhenFinalised = self->blocks;
        self->finaliser = std::this_thread::get_id();
        self->finalised.Add();
    });
    EXPECT_EQ(dispatch_get_context(queue), &context);
    dispatch_async(queue, [&] { EXPECT_TRUE(gate.Passes()); });
    for (int i = 0; i < 3; ++i)
        dispatch_async(queue, [&] { ++context.blocks; });
    dispatch_release(queue);
    EXPECT_EQ(context.finalised.Count(), 0);
    gate.Open();
    ASSERT_TRUE(context.finalised.Reaches(1));
    EXPECT_EQ(context.blocksWhenFinalised, 3);
    EXPECT_NE(context.finaliser, std::this_thread::get_id());
    Rest();
    EXPECT_EQ(context.finalised.Count(), 1);
}

TEST_F(Dispatch, TheFinaliserOfAQueueThatNeverRanAnythingRunsOnThePool) {
    CTally finalised;
    const RestAtEnd rest;
    dispatch_queue_t queue = dispatch_queue_create("", DISPATCH_QUEUE_CONCURRENT);
    dispatch_set_context(queue, &finalised);
    dispatch_set_finalizer_f(queue, AddOne);
    dispatch_release(queue);
    EXPECT_TRUE(finalised.Reaches(1));
}

TEST_F(Dispatch, NoContextIsNotFinalised) {
    static std::atomic<int> calls{0};
    dispatch_queue_t queue = dispatch_queue_create("", DISPATCH_QUEUE_SERIAL);
    dispatch_set_finalizer_f(queue, [](void*) { ++calls; });
    dispatch_release(queue);
    Rest();
    EXPECT_EQ(calls, 0);
}

TEST_F(Dispatch, AQueueMayBeDroppedOnItsOwnThread) {
    CTally finalised;
    const RestAtEnd rest;
    auto* const holder = new dispatch_queue_t(dispatch_queue_create("", DISPATCH_QUEUE_SERIAL));
    dispatch_set_context(*holder, &finalised);
    dispatch_set_finalizer_f(*holder, AddOne);
    dispatch_async(*holder, [holder] { delete holder; });
    EXPECT_TRUE(finalised.Reaches(1));
}

TEST_F(Dispatch, BlocksMayDispatchToTheirOwnQueue) {
    for (const dispatch_queue_attr_t attribute : {DISPATCH_QUEUE_SERIAL, DISPATCH_QUEUE_CONCURRENT}) {
        const dispatch_queue_t queue = dispatch_queue_create("", attribute);
        std::atomic<int> depth{0};
        std::function<void()> next;
        next = [&] {
            if (++depth < 100)
                dispatch_async(queue, next);
        };
        dispatch_async(queue, next);
        Rest();
        EXPECT_EQ(depth, 100);
    }
}

TEST_F(Dispatch, WithoutAnyThreadTheCallerRunsTheBlocksOneBehindTheOther) {
    const CNoNewThreadsScope noThreads;
    const dispatch_queue_t serial = dispatch_queue_create("", DISPATCH_QUEUE_SERIAL);
    const dispatch_queue_t concurrent = dispatch_queue_create("", DISPATCH_QUEUE_CONCURRENT);
    std::vector<int> order;
    std::mutex callersLock; // not recursive: nested blocks would hang
    dispatch_async(serial, [&] {
        const std::lock_guard<std::mutex> lock(callersLock);
        dispatch_async(serial, [&] {
            const std::lock_guard<std::mutex> inner(callersLock);
            order.push_back(2);
        });
        dispatch_async(concurrent, [&] {
            const std::lock_guard<std::mutex> inner(callersLock);
            order.push_back(3);
        });
        order.push_back(1);
    });
    EXPECT_EQ(order, (std::vector<int>{1, 2, 3}));
}

TEST_F(Dispatch, BlocksWaitForAFreeThreadWhenNoMoreCanBeStarted) {
    const dispatch_queue_t queue = dispatch_queue_create("", DISPATCH_QUEUE_CONCURRENT);
    CGate gate;
    CTally entered;
    CTally ran;
    std::atomic<bool> borrowed{false};
    const RestAtEnd rest;
    dispatch_async(queue, [&] {
        entered.Add();
        EXPECT_TRUE(gate.Passes());
    });
    ASSERT_TRUE(entered.Reaches(1));
    const CNoNewThreadsScope noThreads;
    dispatch_async(queue, [&, caller = std::this_thread::get_id()] {
        borrowed = std::this_thread::get_id() == caller;
        ran.Add();
    });
    EXPECT_EQ(ran.Count(), 0);
    gate.Open();
    EXPECT_TRUE(ran.Reaches(1));
    EXPECT_FALSE(borrowed);
}

TEST_F(Dispatch, ARestInsideABorrowedThreadsBlockDoesNotWaitForItself) {
    const CNoNewThreadsScope noThreads;
    const dispatch_queue_t queue = dispatch_queue_create("", DISPATCH_QUEUE_CONCURRENT);
    bool after = false;
    dispatch_async(queue, [&] {
        Rest();
        after = true;
    });
    EXPECT_TRUE(after);
}

TEST_F(Dispatch, QueuesRaceWithRests) {
    const int rounds = 3000 * TestEffort();
    const unsigned seed = std::random_device{}();
    std::cout << rounds << " rounds, seed " << seed << '\n';
    const auto before = CountThreadsOfProcess();
    std::atomic<int> dispatched{0};
    std::atomic<int> ran{0};
    std::atomic<int> queues{0};
    std::atomic<int> outOfOrder{0};
    CTally finalised;
    std::atomic<bool> done{false};
    std::thread resting([&] {
        while (!done) {
            Rest();
            std::this_thread::yield();
        }
    });
    std::vector<std::thread> threads;
    for (unsigned i = 0; i < 3; ++i) {
        threads.emplace_back([&, i] {
            std::mt19937 random(seed + i);
            for (int round = 0; round < rounds; ++round) {
                const bool serial = random() % 2 != 0;
                dispatch_queue_t queue =
                    dispatch_queue_create("", serial ? DISPATCH_QUEUE_SERIAL : DISPATCH_QUEUE_CONCURRENT);
                dispatch_set_context(queue, &finalised);
                dispatch_set_finalizer_f(queue, AddOne);
                ++queues;
                const auto last = std::make_shared<int>(0); // not atomic: serial blocks are in order
                for (auto n = static_cast<int>(random() % 6); n > 0; --n) {
                    ++dispatched;
                    dispatch_async(queue, [&, n, last, serial] {
                        ++ran;
                        if (serial && *last != 0 && *last != n + 1)
                            ++outOfOrder;
                        if (serial)
                            *last = n;
                    });
                }
                dispatch_release(queue);
            }
        });
    }
    for (std::thread& thread : threads)
        thread.join();
    done = true;
    resting.join();
    Rest();
    EXPECT_EQ(ran, dispatched);
    EXPECT_EQ(outOfOrder, 0);
    EXPECT_EQ(finalised.Count(), queues);
    EXPECT_TRUE(ThreadsComeDownTo(before));
}
