// SPDX-License-Identifier: Apache-2.0
#include "tests/src/share_source_enum_tools.h"
#include "tests/src/share_source_tools.h"
#include "tests/support/test_effort.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <functional>
#include <random>
#include <thread>
#include <vector>

namespace {

/// Has `work(random)` run `rounds` times on each of `threads` threads.
void OnThreads(int threads, int rounds, unsigned seed, const std::function<void(std::mt19937&)>& work) {
    std::vector<std::thread> running;
    for (int i = 0; i < threads; ++i) {
        running.emplace_back([=, &work] {
            std::mt19937 random(seed + static_cast<unsigned>(i));
            for (int round = 0; round < rounds; ++round)
                work(random);
        });
    }
    for (std::thread& thread : running)
        thread.join();
}

/// One change of the list, or one look at it.
void TouchList(COpenEnumerator& enumerator, std::mt19937& random) {
    const unsigned long id = random() % 8;
    CHeldSource source;
    switch (random() % 8) {
        case 0:
            if (random() % 4 == 0)
                enumerator.CleanShareSource();
            break;
        case 1:
            enumerator.RemoveSourceById(id, source.Out());
            enumerator.OnShareSourceEvent(SHARE_SOURCE_EVENT_REMOVED, source.Get());
            break;
        case 2:
            if (enumerator.GetSourceBySourceId(id, source.Out()) == 0) {
                EXPECT_EQ(source->GetSourceUniqueId(), id);
            }
            break;
        case 3:
            if (enumerator.GetSource(NumberOf(enumerator) - 1, source.Out()) == 0) {
                EXPECT_LT(source->GetSourceUniqueId(), 8u);
            }
            break;
        case 4: {
            CSourceSink passing;
            enumerator.AddSink(&passing);
            enumerator.RemoveSink(&passing);
            break;
        }
        default:
            enumerator.Append(id);
            break;
    }
}

TEST(CShareSourceEnumeratorHammer, LosesNoReferenceUnderListChangesFromFourThreads) {
    const unsigned seed = std::random_device()();
    const int rounds = 20000 * TestEffort();
    std::printf("4 threads of %d rounds, seed %u\n", rounds, seed);
    {
        COpenEnumerator enumerator;
        CSourceSink counting;
        enumerator.AddSink(&counting);
        OnThreads(4, rounds, seed, [&](std::mt19937& random) { TouchList(enumerator, random); });
        EXPECT_EQ(NumberOf(enumerator), COpenEnumerator::alive);
        EXPECT_EQ(static_cast<int>(IdsOf(enumerator).size()), NumberOf(enumerator));
        EXPECT_GT(counting.Told().size(), 0u);
    }
    EXPECT_EQ(COpenEnumerator::alive, 0);
}

} // namespace
