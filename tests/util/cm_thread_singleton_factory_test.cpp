// SPDX-License-Identifier: Apache-2.0
#include "tests/support/sanitizer.h"
#include "tests/support/test_effort.h"
#include "tests/support/threads.h"
#include "util/cm_thread.h"

#include <gtest/gtest.h>

#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <string>
#include <thread>
#include <vector>

namespace {

ACmThread* Get(ACmThreadSingletonFactory& factory, const char* name) {
    ACmThread* thread = nullptr;
    EXPECT_EQ(factory.GetSingletonThread(name, thread), 0);
    EXPECT_NE(thread, nullptr);
    return thread;
}

} // namespace

TEST(ACmThreadSingletonFactory, IsOneForTheProcess) {
    EXPECT_NE(ACmThreadSingletonFactory::Instance(), nullptr);
    EXPECT_EQ(ACmThreadSingletonFactory::Instance(), ACmThreadSingletonFactory::Instance());
}

TEST(ACmThreadSingletonFactory, GivesOneRunningThreadAName) {
    ACmThreadSingletonFactory factory;
    ACmThread* const first = Get(factory, "a");
    ACmThread* const again = Get(factory, std::string("a").c_str());
    ACmThread* const other = Get(factory, "b");
    EXPECT_EQ(first, again);
    EXPECT_NE(first, other);
    EXPECT_EQ(first->GetName(), "a");
    CmThreadId ranOn = 0;
    EXPECT_EQ(Send(*first, [&] { ranOn = GetThreadSelfId(); }), 0);
    EXPECT_EQ(ranOn, first->GetThreadId());
}

TEST(ACmThreadSingletonFactory, TellsNamesApartBeyondWhatTheSystemShows) {
    ACmThreadSingletonFactory factory;
    EXPECT_NE(Get(factory, "scn-cap-assist-{1}"), Get(factory, "scn-cap-assist-{2}"));
}

TEST(ACmThreadSingletonFactory, EndsAThreadWithItsLastRelease) {
    { CRunningThread first; } // a sanitizer may start a thread of its own with the first one
    const std::ptrdiff_t threads = CountThreadsOfProcess();
    ACmThreadSingletonFactory factory;
    ACmThread* const thread = Get(factory, "a");
    EXPECT_EQ(Get(factory, "a"), thread);
    EXPECT_EQ(factory.ResleseSingletonThread("a", thread), 0);
    EXPECT_EQ(Send(*thread, [] {}), 0) << "somebody still holds it";
    bool fired = false;
    EXPECT_EQ(Post(*thread, [&] { fired = true; }), 0);
    EXPECT_EQ(factory.ResleseSingletonThread("a", thread), 0);
    EXPECT_TRUE(fired);
    EXPECT_TRUE(ThreadsComeDownTo(threads));
}

TEST(ACmThreadSingletonFactory, StartsANameAnewAfterItsLastRelease) {
    ACmThreadSingletonFactory factory;
    ACmThread* thread = Get(factory, "a");
    const CmThreadId former = thread->GetThreadId();
    factory.ResleseSingletonThread("a", thread);
    thread = Get(factory, "a");
    EXPECT_NE(thread->GetThreadId(), former);
    EXPECT_EQ(Send(*thread, [] {}), 0);
}

TEST(ACmThreadSingletonFactory, KnowsOnlyThePairsThatItGaveOut) {
    ACmThreadSingletonFactory factory;
    ACmThread* const thread = Get(factory, "a");
    ACmThread* const other = Get(factory, "b");
    EXPECT_EQ(factory.ResleseSingletonThread("a", other), -1);
    EXPECT_EQ(factory.ResleseSingletonThread("c", thread), -1);
    EXPECT_EQ(factory.ResleseSingletonThread("a", nullptr), -1);
    EXPECT_EQ(factory.ResleseSingletonThread(nullptr, thread), -1);
    EXPECT_EQ(Send(*thread, [] {}), 0);
    EXPECT_EQ(factory.ResleseSingletonThread("a", thread), 0);
    EXPECT_EQ(factory.ResleseSingletonThread("a", thread), -1);
}

TEST(ACmThreadSingletonFactory, GivesNothingWithoutAName) {
    ACmThreadSingletonFactory factory;
    CRunningThread stale;
    ACmThread* thread = &*stale;
    EXPECT_EQ(factory.GetSingletonThread(nullptr, thread), -1);
    EXPECT_EQ(thread, nullptr);
}

TEST(ACmThreadSingletonFactory, GivesNothingWhenTheSystemHasNoRoomForAThread) {
    ACmThreadSingletonFactory factory;
    CRunningThread stale;
    ACmThread* thread = &*stale;
    {
        const CNoNewThreadsScope noRoom;
        EXPECT_EQ(factory.GetSingletonThread("a", thread), -1);
        EXPECT_EQ(thread, nullptr);
    }
    EXPECT_EQ(Send(*Get(factory, "a"), [] {}), 0) << "there is room again";
}

TEST(ACmThreadSingletonFactory, GivesAPendingEventOfTheEndingThreadANewOne) {
    ACmThreadSingletonFactory factory;
    ACmThread* const ending = Get(factory, "a");
    CGate gate;
    ACmThread* next = nullptr;
    Post(*ending, [&] {
        EXPECT_TRUE(gate.Passes());
        next = Get(factory, "a");
        EXPECT_NE(next, ending);
    });
    std::thread opener([&] {
        // Not before the release has begun: until then the name gives the old thread.
        while (Post(*ending, [] {}) == 0)
            std::this_thread::yield();
        gate.Open();
    });
    EXPECT_EQ(factory.ResleseSingletonThread("a", ending), 0);
    opener.join();
    ASSERT_NE(next, nullptr);
    EXPECT_EQ(Send(*next, [] {}), 0);
    EXPECT_EQ(factory.ResleseSingletonThread("a", next), 0);
}

TEST(ACmThreadSingletonFactory, NeverJoinsAThreadOnItself) {
    { CRunningThread first; } // a sanitizer may start a thread of its own with the first one
    const std::ptrdiff_t threads = CountThreadsOfProcess();
    ACmThreadSingletonFactory factory;
    ACmThread* const thread = Get(factory, "a");
    CTally released;
    std::atomic<bool> later{false};
    Post(*thread, [&] {
        Post(*thread, [&] { later = true; });
        EXPECT_EQ(factory.ResleseSingletonThread("a", thread), 0);
        EXPECT_EQ(Post(*thread, [] {}), -1) << "it has been stopped";
        released.Add();
    });
    ASSERT_TRUE(released.Reaches(1));
    EXPECT_TRUE(ThreadsComeDownTo(threads)) << "it ends by itself";
    EXPECT_TRUE(later);
    ACmThread* const next = Get(factory, "a");
    EXPECT_EQ(factory.ResleseSingletonThread("a", next), 0);
}

TEST(ACmThreadSingletonFactory, DoesNotWaitForAReleasedThreadThatIsStillBusy) {
    ACmThreadSingletonFactory factory;
    ACmThread* const busy = Get(factory, "a");
    CTally released;
    CGate gate;
    Post(*busy, [&] {
        EXPECT_EQ(factory.ResleseSingletonThread("a", busy), 0);
        released.Add();
        EXPECT_TRUE(gate.Passes());
    });
    ASSERT_TRUE(released.Reaches(1));
    ACmThread* const next = Get(factory, "a");
    EXPECT_NE(next, busy);
    EXPECT_EQ(factory.ResleseSingletonThread("a", next), 0);
    gate.Open();
}

TEST(ACmThreadSingletonFactory, JoinsAllAtItsEnd) {
    { CRunningThread first; } // a sanitizer may start a thread of its own with the first one
    const std::ptrdiff_t threads = CountThreadsOfProcess();
    std::atomic<int> fired{0};
    CGate gate;
    const auto fireLate = [&] {
        EXPECT_TRUE(gate.Passes());
        for (int i = 0; i < 1000; ++i)
            std::this_thread::yield();
        ++fired;
    };
    std::thread opener;
    {
        ACmThreadSingletonFactory factory;
        ACmThread* const held = Get(factory, "held");
        ACmThread* const released = Get(factory, "released");
        CTally begun;
        Post(*held, fireLate);
        Post(*released, [&] {
            Post(*released, fireLate);
            factory.ResleseSingletonThread("released", released);
            begun.Add();
        });
        ASSERT_TRUE(begun.Reaches(1));
        opener = std::thread([&gate, held = held->shared_from_this()] {
            while (Post(*held, [] {}) == 0)
                std::this_thread::yield();
            gate.Open();
        });
    }
    EXPECT_EQ(fired, 2);
    opener.join();
    EXPECT_TRUE(ThreadsComeDownTo(threads));
}

TEST(ACmThreadSingletonFactoryDeathTest, EndsThreadsThatWereNotPaidBackWhenTheProcessExits) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    const auto exitWithThreads = [] {
        static ACmThread* held = nullptr;
        // Runs after the factory's end: whoever holds a thread may still post to it.
        std::atexit([] {
            if (held != nullptr && Post(*held, [] {}) != -1)
                std::_Exit(3);
        });
        ACmThreadSingletonFactory& factory = *ACmThreadSingletonFactory::Instance();
        held = Get(factory, "a");
        Post(*held, [] {});
        std::exit(0);
    };
    EXPECT_EXIT(exitWithThreads(), testing::ExitedWithCode(0), "");
}

TEST(ACmThreadSingletonFactoryDeathTest, LetsTheProcessExitFromOneOfItsThreads) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    const auto exitOnThread = [] {
        ACmThread* const thread = Get(*ACmThreadSingletonFactory::Instance(), "a");
        Post(*thread, [] { std::exit(7); });
        const CGate never;
        std::exit(never.Passes() ? 1 : 2);
    };
    EXPECT_EXIT(exitOnThread(), testing::ExitedWithCode(7), "");
}

TEST(ACmThreadSingletonFactoryDeathTest, LetsAForkedChildExitWithoutTheThreadsOfItsParent) {
    if (SCREENSHARE_TEST_SANITIZED)
        GTEST_SKIP() << "a sanitizer's own check at exit may hang in a child that was forked among threads";
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    const auto forkAndExit = [] {
        ACmThread* const thread = Get(*ACmThreadSingletonFactory::Instance(), "a");
        std::atomic<bool> done{false};
        std::thread busy([&] {
            while (!done)
                thread->GetTimerQueue()->CancelTimer(nullptr); // holds the thread's lock as often as not
        });
        for (int round = 0; round < 8; ++round) {
            const pid_t child = fork();
            if (child == 0) {
                alarm(static_cast<unsigned>(PATIENCE.count()));
                std::exit(5);
            }
            int status = -1;
            if (waitpid(child, &status, 0) != child || !WIFEXITED(status) || WEXITSTATUS(status) != 5)
                std::exit(1);
        }
        done = true;
        busy.join();
        std::exit(0);
    };
    EXPECT_EXIT(forkAndExit(), testing::ExitedWithCode(0), "");
}

TEST(ACmThreadSingletonFactoryHammer, GivesEveryHolderARunningThread) {
    const int rounds = 400 * TestEffort();
    std::printf("4 threads, %d rounds each\n", rounds);
    { CRunningThread first; } // a sanitizer may start a thread of its own with the first one
    const std::ptrdiff_t threads = CountThreadsOfProcess();
    ACmThreadSingletonFactory factory;
    std::vector<std::thread> holders;
    std::atomic<int> fired{0};
    for (int holder = 0; holder < 4; ++holder) {
        holders.emplace_back([&, holder] {
            const char* const name = holder % 2 == 0 ? "a" : "b";
            for (int round = 0; round < rounds; ++round) {
                ACmThread* thread = nullptr;
                ASSERT_EQ(factory.GetSingletonThread(name, thread), 0);
                EXPECT_EQ(Send(*thread, [&] { ++fired; }), 0);
                ASSERT_EQ(factory.ResleseSingletonThread(name, thread), 0);
            }
        });
    }
    for (std::thread& holder : holders)
        holder.join();
    EXPECT_EQ(fired, 4 * rounds);
    EXPECT_TRUE(ThreadsComeDownTo(threads));
}
