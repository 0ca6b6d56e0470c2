// SPDX-License-Identifier: Apache-2.0
#include "src/mac/thumbnail_capturer_mac.h"
#include "src/thumbnail_capture_engine.h"
#include "tests/src/mac/backend_tools.h"
#include "tests/src/thumbnail_tools.h"
#include "tests/support/memory_failure.h"

#include <screenshare/share_engine.h>

#include <gtest/gtest.h>

#include <atomic>
#include <cstddef>
#include <exception>
#include <functional>
#include <iostream>
#include <memory>
#include <ostream>
#include <string>
#include <utility>

// Memory runs out at every single place of a request where it is asked for, and comes back.

namespace {

constexpr pid_t EDITOR = 5'000'100;
constexpr unsigned HELD = 9;
constexpr unsigned IDS[] = {1, 2, 3};
constexpr unsigned char GREEN = 0xE0;

/// This thread's memory lasts for so many allocations, as long as this lives.
class CScarceMemory {
public:
    explicit CScarceMemory(int allocations) { allocationsLeft = allocations; }
    ~CScarceMemory() { End(); }
    CScarceMemory(const CScarceMemory&) = delete;
    CScarceMemory& operator=(const CScarceMemory&) = delete;

    /// True when it hasn't lasted.
    bool End() {
        m_ranOut = m_ranOut || isMemoryGone;
        isMemoryGone = false;
        allocationsLeft = -1;
        return m_ranOut;
    }

private:
    bool m_ranOut = false;
};

enum class Answer {
    Yes,
    No,
    Threw,
};

void PrintTo(Answer answer, std::ostream* out) {
    *out << (answer == Answer::Yes ? "yes" : answer == Answer::No ? "no" : "an exception");
}

struct Outcome {
    Answer answer = Answer::Threw;
    bool ranOut = false;
};

Outcome AskWithMemoryFor(int allocations, const std::function<bool()>& ask) {
    Outcome outcome;
    CScarceMemory memory(allocations);
    try {
        outcome.answer = ask() ? Answer::Yes : Answer::No;
    } catch (const std::exception&) {
        outcome.answer = Answer::Threw;
    }
    outcome.ranOut = memory.End();
    return outcome;
}

platform::Scene DeskWithWindows() {
    return platform::Scene()
        .Display(0, 0, 100, 100)
        .App(EDITOR, "Editor")
        .Window(1)
        .At(0, 0, 20, 10)
        .Window(2)
        .At(0, 0, 30, 10)
        .Colour(0x10E020)
        .Window(3)
        .At(0, 0, 40, 10);
}

class ThumbnailMemory : public testing::Test {
protected:
    using Ask = std::function<bool(ThumbnailCallback& callback)>;

    /// Asks, while there is no worker, with memory for no allocation, for one, and so on, until there is
    /// enough; every time the next request has to come through. Gives the number of requests for which there
    /// was too little.
    int AskWithLittle(const Ask& ask, const Ask& askNext) {
        constexpr int MANY = 1000;
        const auto threads = CountThreadsOfProcess();
        for (int allocations = 0; allocations < MANY; ++allocations) {
            CThumbnailLog starved;
            const Outcome outcome = AskWithMemoryFor(allocations, [&] { return ask(starved); });
            EXPECT_NE(outcome.answer, Answer::Threw) << "memory for " << allocations;
            if (!outcome.ranOut) {
                EXPECT_EQ(outcome.answer, Answer::Yes);
                EXPECT_TRUE(starved.lasts.Reaches(1));
                EXPECT_TRUE(ThreadsComeDownTo(threads));
                return allocations;
            }
            EXPECT_EQ(outcome.answer, Answer::No) << "memory for " << allocations;
            CThumbnailLog next;
            EXPECT_TRUE(askNext(next)) << "behind memory for " << allocations;
            if (!next.lasts.Reaches(1)) {
                ADD_FAILURE() << "the engine is dead, behind memory for " << allocations;
                return allocations;
            }
            EXPECT_EQ(starved.calls.Count(), 0) << "a refused request has run";
            EXPECT_TRUE(ThreadsComeDownTo(threads));
        }
        ADD_FAILURE() << "there is never enough";
        return MANY;
    }
};

/// Captures of window 2 find memory for so many allocations; those of others find enough.
struct Poverty {
    int allocations = 0;
    std::atomic<bool> ranOut{false};
    std::atomic<bool> isWhole{false}; ///< The picture that came shows the window.
};

class CPoorCapturer final : public CThumbnailCapturerMac {
public:
    explicit CPoorCapturer(Poverty& poverty) : m_poverty(poverty) {}

    bool captureWindowImage(unsigned window, ImageData& image) override {
        if (window != 2)
            return CThumbnailCapturerMac::captureWindowImage(window, image);
        CScarceMemory memory(m_poverty.allocations);
        bool isCaptured = false;
        try {
            isCaptured = CThumbnailCapturerMac::captureWindowImage(window, image);
        } catch (...) {
            m_poverty.ranOut = memory.End();
            throw;
        }
        m_poverty.ranOut = memory.End();
        const std::ptrdiff_t lastRow = std::ptrdiff_t{image.height - 1} * image.lineBytes;
        m_poverty.isWhole = isCaptured && image.data[1] == GREEN && image.data[lastRow + 1] == GREEN;
        return isCaptured;
    }

private:
    Poverty& m_poverty;
};

class CPoorEngine final : public CThumbnailCaptureEngine {
public:
    using Make = std::function<std::unique_ptr<CThumbnailCapturer>()>;

    explicit CPoorEngine(Make make) : m_make(std::move(make)) {}
    ~CPoorEngine() override { stop(); }

private:
    std::unique_ptr<CThumbnailCapturer> NewCapturer() override { return m_make(); }

    const Make m_make;
};

} // namespace

// ---- The caller's memory

TEST_F(ThumbnailMemory, RefusesARequestForWhichThereIsNoneAndTakesTheNext) {
    ThumbnailPlan plan;
    CPlannedEngine engine(plan);
    const auto windows = [&](ThumbnailCallback& log) { return engine.requestForWindows(IDS, 3, &log); };
    const auto apps = [&](ThumbnailCallback& log) { return engine.requestForApps(IDS, 3, &log); };
    for (const Ask& ask : {Ask(windows), Ask(apps)}) {
        const int refused = AskWithLittle(ask, windows);
        std::cout << refused << " requests refused\n";
        EXPECT_GT(refused, 3) << "a request, a job and a worker take more";
    }
}

TEST_F(ThumbnailMemory, RefusesARequestBesideARunningJobWhichGoesOn) {
    CHeldCapture held(HELD);
    ThumbnailPlan plan;
    plan.capture = [&held](unsigned id) { return held(id); };
    CThumbnailLog occupant;
    CPlannedEngine engine(plan);
    ASSERT_TRUE(engine.RequestWindows({HELD, 1}, occupant));
    ASSERT_TRUE(held.IsReached());
    int refused = 0;
    for (CThumbnailLog starved;; ++refused) {
        ASSERT_LT(refused, 1000) << "there is never enough";
        const Outcome outcome =
            AskWithMemoryFor(refused, [&] { return engine.requestForWindows(IDS, 3, &starved); });
        EXPECT_EQ(outcome.answer, outcome.ranOut ? Answer::No : Answer::Yes) << "memory for " << refused;
        if (outcome.ranOut)
            continue;
        held.Release();
        ASSERT_TRUE(starved.lasts.Reaches(1));
        ASSERT_TRUE(occupant.lasts.Reaches(1));
        EXPECT_EQ(starved.calls.Count(), 3) << "one job of all these requests";
        break;
    }
    EXPECT_GT(refused, 0);
    EXPECT_EQ(plan.made.Count(), 1);
}

/// Where it runs out while the desktop is looked at, that finds no windows; so the answer may be either.
TEST_F(ThumbnailMemory, NeverLetsARequestForAllApplicationsThrow) {
    const CServedScene desk(DeskWithWindows());
    CThumbnailCaptureEngine engine;
    for (int allocations = 0;; ++allocations) {
        ASSERT_LT(allocations, 1000) << "there is never enough";
        CThumbnailLog starved;
        const Outcome outcome = AskWithMemoryFor(allocations, [&] { return engine.request(&starved); });
        ASSERT_NE(outcome.answer, Answer::Threw) << "memory for " << allocations;
        CThumbnailLog next;
        ASSERT_TRUE(engine.request(&next));
        ASSERT_TRUE(next.lasts.Reaches(1)) << "behind memory for " << allocations;
        EXPECT_EQ(next.Calls(), ThumbnailCalls{"app 5000100 40x10 last"});
        engine.cancel(&starved);
        if (!outcome.ranOut)
            break;
    }
}

TEST_F(ThumbnailMemory, IsNoneOfTheClientsConcernBehindTheExportedFunctions) {
    const CServedScene desk(DeskWithWindows());
    const auto windows = [](ThumbnailCallback& log) { return EnumWindowThumbnail(IDS, 3, &log) == 0; };
    const auto apps = [](ThumbnailCallback& log) {
        const unsigned pid = EDITOR;
        return EnumAppThumbnail(&pid, 1, &log) == 0;
    };
    EXPECT_GT(AskWithLittle(windows, apps), 3);
    EXPECT_GT(AskWithLittle(apps, windows), 3);
}

// ---- The worker's memory

TEST_F(ThumbnailMemory, FailsAnItemForWhichThereIsNoneAndGoesOn) {
    const CServedScene desk(DeskWithWindows());
    int failures = 0;
    for (int allocations = 0;; ++allocations) {
        ASSERT_LT(allocations, 1000) << "there is never enough";
        Poverty poverty;
        poverty.allocations = allocations;
        CPoorEngine engine([&] { return std::make_unique<CPoorCapturer>(poverty); });
        CThumbnailLog log;
        ASSERT_TRUE(engine.requestForWindows(IDS, 3, &log));
        ASSERT_TRUE(log.lasts.Reaches(1));
        const std::string second = poverty.isWhole ? "window 2 30x10" : "window 2 failed";
        EXPECT_EQ(log.Calls(), (ThumbnailCalls{"window 1 20x10", second, "window 3 40x10 last"}))
            << "memory for " << allocations;
        if (!poverty.ranOut) {
            EXPECT_TRUE(poverty.isWhole);
            break;
        }
        failures += poverty.isWhole ? 0 : 1;
    }
    std::cout << failures << " captures without memory\n";
    EXPECT_GT(failures, 0);
}

TEST_F(ThumbnailMemory, TellsThatThereAreNoThumbnailsWhenThereIsNoneForACapturer) {
    const CServedScene desk(DeskWithWindows());
    bool isPoor = true;
    CPoorEngine engine([&]() -> std::unique_ptr<CThumbnailCapturer> {
        const CScarceMemory memory(isPoor ? 0 : -1);
        return std::make_unique<CThumbnailCapturerMac>();
    });
    CThumbnailLog log;
    ASSERT_TRUE(engine.requestForWindows(IDS, 1, &log));
    ASSERT_TRUE(log.calls.Reaches(1));
    EXPECT_EQ(log.Calls(), ThumbnailCalls{"error -1"});
    engine.cancel(&log); // waits until all have been told, so that the next request has a worker of its own
    isPoor = false;
    CThumbnailLog next;
    ASSERT_TRUE(engine.requestForWindows(IDS, 1, &next));
    ASSERT_TRUE(next.lasts.Reaches(1));
    EXPECT_EQ(next.Calls(), ThumbnailCalls{"window 1 20x10 last"});
}
