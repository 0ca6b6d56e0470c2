// SPDX-License-Identifier: Apache-2.0
#include "tests/src/share_capturer_context_tools.h"
#include "tests/support/give_way.h"
#include "tests/support/test_effort.h"
#include "tests/support/threads.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <chrono>
#include <cstdio>
#include <map>
#include <mutex>
#include <random>
#include <thread>
#include <vector>

/// List changes from three threads beside a walk that commits and threads that read. That a fault in the
/// locking would be noticed is shown on contexts that have it.

namespace {

constexpr unsigned FIRST_SEED = 50'021;
constexpr int ROUNDS_AT_FULL_EFFORT = 100'000;
constexpr int FULL_EFFORT = 100;

/// These are only ever added, by all threads to either list: each must stay on just one.
constexpr std::array<unsigned, 3> CONTESTED{1, 2, 3};
/// Each thread adds and removes one of its own here, beyond the contested ones.
constexpr unsigned FIRST_OWN = 10;

constexpr TVLRect DISPLAY{0, 0, 64, 8};
constexpr unsigned MAIN_DISPLAY = 7;

bool Has(const Values& values, unsigned value) {
    return std::find(values.begin(), values.end(), value) != values.end();
}

/// What the hammered operations found wrong.
class Findings {
public:
    void Expect(bool isGood, const char* what) {
        if (isGood)
            return;
        if (m_count.fetch_add(1) == 0)
            m_first = what;
    }
    int Count() const { return m_count; }
    const char* First() const { return m_first; }

private:
    std::atomic<int> m_count{0};
    std::atomic<const char*> m_first{""};
};

/// Commits like a walk, each commit telling its number wherever it can.
template <class Context>
class Committer {
public:
    explicit Committer(Context& context) : m_context(context) {}

    void Commit(unsigned number) {
        auto& found = m_context.m_paramSet;
        found.reset();
        // What is seen and what is hidden share the display between them, each time along another line. Where
        // the line goes back, which it often does, half of a commit leaves something to neither.
        const int line = static_cast<int>(number * 25 % 62) + 1;
        found.rgnVisible.AddRect({0, 0, line, 8});
        found.rgnOverlap.AddRect({line, 0, 64, 8});
        // Two rectangles in a box of constant size, far from that of the commit before.
        const int left = static_cast<int>(number % 1000) * 100;
        found.rgnSharedWindow.AddRect({left, 0, left + 10, 5});
        found.rgnSharedWindow.AddRect({left + 20, 5, left + 30, 10});
        for (unsigned i = 0; i <= number % 5; ++i) {
            found.vCapturedWindows.push_back(number);
            found.vCapturedExcludedWindows.push_back(number);
        }
        found.vAppDisplays.assign(1, MAIN_DISPLAY + number % 2);
        m_context._CommitParamSet(found);
    }

private:
    Context& m_context;
};

/// Looks at the published results as other threads do.
template <class Context>
class Reader {
public:
    Reader(const Context& context, Findings& findings) : m_context(context), m_findings(findings) {}

    void Look() {
        ExpectOneCommit(&ShareCapturerContext::GetCapturedWindows, "captured windows of two commits");
        ExpectOneCommit(&ShareCapturerContext::GetCapturedExcludedWindows, "excluded windows of two commits");
        m_context.GetAppMonitors(m_values);
        m_findings.Expect(m_values.size() <= 1, "displays of two commits");
        // Often, since a gap between its two regions would be a narrow one.
        for (int i = 0; i < 20; ++i) {
            m_context.GetBackgroundInvisiableRegion(m_region);
            m_findings.Expect(m_region.IsEmpty(), "a background made of two commits");
        }
        m_context.GetInvisiableRegion(m_region);
        ExpectRects(1, "an invisible region of two commits");
        m_context.GetVisiableRegion(m_region);
        ExpectRects(1, "a visible region of two commits");
        m_context.GetOverlapRegion(m_region);
        ExpectRects(1, "an overlap region of two commits");
        m_context.GetSharedWindowRegion(m_region);
        ExpectRects(2, "a region of shared windows of two commits");
        TVLRect box{};
        m_context.GetSharedWindowBoxRect(box);
        m_findings.Expect(box.right - box.left == 30, "a box of two commits");
        m_context.IsWindowUnShared(CONTESTED[0]);
        m_context.IsAppShared(CONTESTED[0]);
        m_context.GetSharedWindows(m_values);
        m_context.GetDisplayRegion(m_region);
        ExpectRects(1, "a region of displays in the making");
        m_findings.Expect(m_context.GetDisplayBoxRect(box) == SHARE_RESULT_OK,
                          "a box of displays in the making");
        m_context.GetDisplayRects(m_displayRects);
        m_findings.Expect(m_displayRects.size() == 1, "displays in the making");
    }

private:
    void ExpectOneCommit(Getter<Values> get, const char* what) {
        (m_context.*get)(m_values);
        const bool isGood = std::all_of(m_values.begin(), m_values.end(), [this](unsigned value) {
            return value == m_values.front() && m_values.size() == value % 5 + 1;
        });
        m_findings.Expect(isGood, what);
    }
    void ExpectRects(std::size_t count, const char* what) {
        m_rects.clear();
        m_region.GetRects(m_rects);
        m_findings.Expect(m_rects.size() == count, what);
    }

    const Context& m_context;
    Findings& m_findings;
    Values m_values;
    TVLRegion m_region;
    Rects m_rects;
    std::map<unsigned, TVLRect> m_displayRects;
};

/// One of the three threads that change the lists.
template <class Context>
class Changer {
public:
    Changer(Context& context, Findings& findings, unsigned index)
        : m_context(context),
          m_findings(findings),
          m_own(FIRST_OWN + index),
          m_random(FIRST_SEED + index) {}

    void Change() {
        const unsigned value = CONTESTED[m_random() % CONTESTED.size()];
        AddWindow(value);
        AddApp(value);
        ExpectOnOne(value);
        AddWindow(m_own);
        AddApp(m_own);
        ExpectOnOne(m_own);
        m_findings.Expect(m_context.RemoveSharedWindow(m_own) + m_context.RemoveUnSharedWindow(m_own) == -1,
                          "a window to be removed from one list");
        m_findings.Expect(m_context.RemoveSharedApp(m_own) + m_context.RemoveUnSharedApp(m_own) == -1,
                          "an application to be removed from one list");
        m_context.AddSharedDisplay(m_own);
        m_context.RemoveSharedDisplay(m_own);
        m_context.SetShareType(SHARE_TYPE_WINDOW);
        m_context.SetCaptureMaxSize({static_cast<int>(m_own), 1});
    }

private:
    void AddWindow(unsigned value) {
        m_random() % 2 == 0 ? m_context.AddSharedWindow(value) : m_context.AddUnSharedWindow(value);
    }
    void AddApp(unsigned value) {
        m_random() % 2 == 0 ? m_context.AddSharedApp(value) : m_context.AddUnSharedApp(value);
    }
    /// In one moment, and not by two getters one after the other.
    void ExpectOnOne(unsigned value) {
        const std::lock_guard<std::recursive_mutex> lock(m_context.m_paramLock);
        m_findings.Expect(Has(m_context.m_vSharedWindows, value) != Has(m_context.m_vUnSharedWindows, value),
                          "a window on neither list or on both");
        m_findings.Expect(Has(m_context.m_vSharedApps, value) != Has(m_context.m_vUnSharedApps, value),
                          "an application on neither list or on both");
    }

    Context& m_context;
    Findings& m_findings;
    unsigned m_own;
    std::mt19937 m_random;
};

/// Makes its displays anew as a real one does, and they always come out the same.
class CHammeredContext : public CContextProbe {
public:
    CHammeredContext() { CHammeredContext::InitDisplays(); }

    int InitDisplays() override {
        const std::lock_guard<std::recursive_mutex> lock(m_displayLock);
        m_rgnDisplay.Empty();
        m_mapDisplayRects.clear();
        m_rgnDisplay.AddRect(DISPLAY);
        m_mapDisplayRects[MAIN_DISPLAY] = DISPLAY;
        return SHARE_RESULT_OK;
    }
};

/// Everything at once until `isDone`, which is told the rounds of the slowest thread.
template <class Context, class IsDone>
void Hammer(Findings& findings, IsDone isDone) {
    const CDesktopScope desktop;
    Context context;
    Committer<Context> committer(context);
    committer.Commit(0);
    std::array<std::atomic<int>, 6> rounds{};
    std::atomic<bool> isOver{false};
    const auto run = [&](std::size_t index, auto turn) {
        while (!isOver) {
            turn();
            ++rounds[index];
        }
    };
    std::vector<std::thread> threads;
    for (unsigned i = 0; i < 3; ++i) {
        threads.emplace_back([&, i] {
            Changer<Context> changer(context, findings, i);
            run(i, [&] { changer.Change(); });
        });
    }
    threads.emplace_back([&] {
        unsigned number = 0;
        run(3, [&] { committer.Commit(++number); });
    });
    for (std::size_t i = 4; i < rounds.size(); ++i) {
        threads.emplace_back([&, i] {
            Reader<Context> reader(context, findings);
            run(i, [&] { reader.Look(); });
        });
    }
    while (!isDone(*std::min_element(rounds.begin(), rounds.end())))
        std::this_thread::yield();
    isOver = true;
    for (std::thread& thread : threads)
        thread.join();
}

/// Makes a gap in the locking wide enough to be met soon.
void LetOthersRun() {
    GiveWay(50);
}

/// As if the lists were changed one after the other.
class CTwoStepContext : public CHammeredContext {
public:
    int AddSharedWindow(unsigned window) {
        return AddInTwoSteps(window, m_vSharedWindows, m_vUnSharedWindows);
    }
    int AddUnSharedWindow(unsigned window) {
        return AddInTwoSteps(window, m_vUnSharedWindows, m_vSharedWindows);
    }

private:
    int AddInTwoSteps(unsigned window, Values& onto, Values& off) {
        {
            const std::lock_guard<std::recursive_mutex> lock(m_paramLock);
            if (Has(onto, window))
                return SHARE_RESULT_OK;
            onto.push_back(window);
        }
        LetOthersRun();
        const std::lock_guard<std::recursive_mutex> lock(m_paramLock);
        off.erase(std::remove(off.begin(), off.end(), window), off.end());
        return SHARE_RESULT_OK;
    }
};

/// As if a walk were published piece by piece.
class CPiecemealContext : public CHammeredContext {
public:
    void _CommitParamSet(ParamSet& found) {
        {
            const std::lock_guard<std::recursive_mutex> lock(m_paramLock);
            m_rgnVisible.CopyRgn(found.rgnVisible);
        }
        LetOthersRun();
        CHammeredContext::_CommitParamSet(found);
    }
};

/// As if the two regions were read one after the other.
class CTwoReadsContext : public CHammeredContext {
public:
    int GetBackgroundInvisiableRegion(TVLRegion& region) const {
        TVLRegion overlap;
        GetInvisiableRegion(region);
        LetOthersRun();
        GetOverlapRegion(overlap);
        region.CombineRgn(overlap, REGION_COMBINE_DIFF);
        return SHARE_RESULT_OK;
    }
};

template <class Context>
const char* FirstFindingOn() {
    Findings findings;
    const auto end = std::chrono::steady_clock::now() + PATIENCE;
    Hammer<Context>(findings,
                    [&](int) { return findings.Count() != 0 || std::chrono::steady_clock::now() > end; });
    return findings.First();
}

} // namespace

TEST(ShareCapturerContextHammer, KeepsEveryValueOnOneListAndEveryResultOfOneCommit) {
    const int rounds = ROUNDS_AT_FULL_EFFORT / FULL_EFFORT * TestEffort();
    std::printf("%d rounds of each thread, seed %u\n", rounds, FIRST_SEED);
    Findings findings;
    Hammer<CHammeredContext>(findings,
                             [&](int slowest) { return slowest >= rounds || findings.Count() != 0; });
    EXPECT_EQ(findings.Count(), 0) << findings.First();
}

TEST(ShareCapturerContextHammer, NoticesListsThatAreNotChangedInOneStep) {
    EXPECT_STREQ(FirstFindingOn<CTwoStepContext>(), "a window on neither list or on both");
}

TEST(ShareCapturerContextHammer, NoticesAWalkThatIsPublishedPieceByPiece) {
    EXPECT_STREQ(FirstFindingOn<CPiecemealContext>(), "a background made of two commits");
}

TEST(ShareCapturerContextHammer, NoticesRegionsThatAreReadOneAfterTheOther) {
    EXPECT_STREQ(FirstFindingOn<CTwoReadsContext>(), "a background made of two commits");
}
