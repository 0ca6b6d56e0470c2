// SPDX-License-Identifier: Apache-2.0
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

/// Threads inside callbacks that wait for each other's engines. A ring of them would never end, so one of the
/// calls is refused.

namespace {

using Results = std::vector<int>;

const std::string STOP_REFUSED =
    Error("[CShareCaptureEngine::Stop]>>fail>>a callback of this engine waits for this thread");
const std::string SET_SINK_REFUSED =
    Error("[CShareCaptureEngine::SetSink]>>fail>>a callback of this engine waits for this thread");

/// Engines whose callbacks all begin before the first of them goes on.
class CRing {
public:
    explicit CRing(std::size_t size) {
        for (std::size_t i = 0; i < size; ++i)
            m_members.push_back(std::make_unique<Member>(m_calls));
        for (const auto& member : m_members) {
            EXPECT_EQ(member->engine->SetExternalIShareCapturer(&member->capturer), 0);
            EXPECT_EQ(member->engine->SetSink(&member->sink), 0);
        }
    }
    ~CRing() {
        for (const auto& member : m_members) {
            if (member->engine != nullptr) {
                EXPECT_EQ(DestroyShareCaptureEngine(member->engine), 0);
            }
        }
    }
    CRing(const CRing&) = delete;
    CRing& operator=(const CRing&) = delete;

    CEngineProbe<CShareCaptureEngine>& Engine(std::size_t i) { return *m_members[i]->engine; }
    CFakeCapturer& Capturer(std::size_t i) { return m_members[i]->capturer; }
    CRecordingSink& Sink(std::size_t i) { return m_members[i]->sink; }
    void Forget(std::size_t i) { m_members[i]->engine = nullptr; }

    /// What a callback runs: gives the result of `call`, once all `count` of them have got here.
    void Meet(int count, const std::function<int()>& call) {
        m_inside.Add();
        EXPECT_TRUE(m_inside.Reaches(count));
        const int result = call();
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_results.push_back(result);
        m_done.Add();
    }

    /// In the first frame of each engine, or the first call of its capturer, `call` is made for the next one.
    /// Gives what comes of it, sorted.
    Results InFrames(const std::function<int(std::size_t)>& call) {
        for (std::size_t i = 0; i < m_members.size(); ++i)
            m_members[i]->sink.SetFrameHook(Caller(i, call));
        return Tick();
    }
    Results InCaptures(const std::function<int(std::size_t)>& call) {
        for (std::size_t i = 0; i < m_members.size(); ++i)
            m_members[i]->capturer.SetHook(Caller(i, call));
        return Tick();
    }

    Results WaitForResults(std::size_t count) {
        EXPECT_TRUE(m_done.Reaches(static_cast<int>(count)));
        const std::lock_guard<std::mutex> lock(m_mutex);
        std::sort(m_results.begin(), m_results.end());
        return m_results;
    }

    std::ptrdiff_t CountOf(SHARE_CAPTURE_ENGINE_STATUS status) const {
        return std::count_if(m_members.begin(), m_members.end(), [status](const auto& member) {
            return member->engine != nullptr && member->engine->GetCaptureStatus() == status;
        });
    }

    CManualClockScope clock;
    CTraceLog trace;
    CGate hasFrame;
    CGate isInside;

private:
    std::function<void(IShareFrame*)> Caller(std::size_t i, std::function<int(std::size_t)> call) {
        return [this, i, call = std::move(call)](IShareFrame*) {
            Meet(static_cast<int>(m_members.size()), [&] { return call((i + 1) % m_members.size()); });
        };
    }

    /// One, so no callback comes twice.
    Results Tick() {
        for (const auto& member : m_members)
            EXPECT_EQ(member->engine->Start(), 0);
        clock->Advance(std::chrono::milliseconds(200));
        return WaitForResults(m_members.size());
    }

    struct Member {
        explicit Member(CCallLog& calls)
            : capturer(calls),
              sink(calls),
              engine(new CEngineProbe<CShareCaptureEngine>) {}
        CFakeCapturer capturer;
        CRecordingSink sink;
        CEngineProbe<CShareCaptureEngine>* engine;
    };

    CCallLog m_calls;
    std::vector<std::unique_ptr<Member>> m_members;
    CTally m_inside;
    CTally m_done;
    std::mutex m_mutex;
    Results m_results;
};

/// The assist thread is inside the sink of engine 1, whose worker has a frame for it, and stops engine 0, in
/// whose frame `call` is made. Gives what comes of both, sorted.
Results InAFrameAndAnEvent(CRing& ring, const std::function<int()>& call) {
    ring.Capturer(1).SetHook([&ring](IShareFrame*) {
        ring.hasFrame.Open();
        EXPECT_TRUE(ring.isInside.Passes());
    });
    ring.Sink(1).SetNoticeHook([&ring](const std::string& text) {
        if (text != "error -204")
            return;
        ring.isInside.Open();
        ring.Meet(2, [&] { return ring.Engine(0).Stop(); });
    });
    EXPECT_EQ(ring.Engine(1).Start(), 0);
    ring.clock->Advance(std::chrono::milliseconds(200));
    EXPECT_TRUE(ring.hasFrame.Passes());
    EXPECT_EQ(ring.Engine(1).OnCapturedNoSharedApp(), 0);
    EXPECT_TRUE(ring.isInside.Passes());

    ring.Sink(0).SetFrameHook([&ring, call](IShareFrame*) { ring.Meet(2, call); });
    EXPECT_EQ(ring.Engine(0).Start(), 0);
    ring.clock->Advance(std::chrono::milliseconds(200));
    return ring.WaitForResults(2);
}

/// All are done but one, sorted.
Results OneRefusal(std::size_t count) {
    Results results(count, 0);
    results.front() = -1;
    return results;
}

class Rings : public testing::TestWithParam<std::size_t> {};

} // namespace

TEST_P(Rings, OfFramesThatStopTheNextEngineAreRefusedOnce) {
    CRing ring(GetParam());
    EXPECT_EQ(ring.InFrames([&](std::size_t next) { return ring.Engine(next).Stop(); }),
              OneRefusal(GetParam()));
    EXPECT_EQ(ring.CountOf(SHARE_CAPTURE_ENGINE_STATUS_STARTED), 1);
    EXPECT_EQ(ring.trace.LinesContaining(STOP_REFUSED).size(), 1u);
}

TEST_P(Rings, OfCapturesThatStopTheNextEngineAreRefusedOnce) {
    CRing ring(GetParam());
    EXPECT_EQ(ring.InCaptures([&](std::size_t next) { return ring.Engine(next).Stop(); }),
              OneRefusal(GetParam()));
    EXPECT_EQ(ring.CountOf(SHARE_CAPTURE_ENGINE_STATUS_STARTED), 1);
}

TEST_P(Rings, OfFramesThatDestroyTheNextEngineAreRefusedOnce) {
    CRing ring(GetParam());
    const auto destroy = [&](std::size_t next) {
        const int result = DestroyShareCaptureEngine(&ring.Engine(next));
        if (result == 0)
            ring.Forget(next);
        return result;
    };
    EXPECT_EQ(ring.InFrames(destroy), OneRefusal(GetParam()));
    EXPECT_EQ(ring.CountOf(SHARE_CAPTURE_ENGINE_STATUS_STARTED), 1);
}

TEST_P(Rings, OfFramesThatTakeTheNextSinkAwayAreRefusedOnce) {
    CRing ring(GetParam());
    EXPECT_EQ(ring.InFrames([&](std::size_t next) { return ring.Engine(next).SetSink(nullptr); }),
              OneRefusal(GetParam()));
    EXPECT_EQ(ring.trace.LinesContaining(SET_SINK_REFUSED).size(), 1u);
}

INSTANTIATE_TEST_SUITE_P(All, Rings, testing::Values(2, 3, 5));

TEST(ShareCaptureEngineRing, OfAFrameAndAnEventThatStopEachOthersEnginesIsRefusedOnce) {
    CRing ring(2);
    EXPECT_EQ(InAFrameAndAnEvent(ring, [&] { return ring.Engine(1).Stop(); }), OneRefusal(2));
    EXPECT_EQ(ring.CountOf(SHARE_CAPTURE_ENGINE_STATUS_STARTED), 1);
}

TEST(ShareCaptureEngineRing, OfAFrameThatDestroysAnEngineAndItsEventIsRefusedOnce) {
    CRing ring(2);
    const auto destroy = [&] {
        const int result = DestroyShareCaptureEngine(&ring.Engine(1));
        if (result == 0)
            ring.Forget(1);
        return result;
    };
    EXPECT_EQ(InAFrameAndAnEvent(ring, destroy), OneRefusal(2));
    EXPECT_EQ(ring.CountOf(SHARE_CAPTURE_ENGINE_STATUS_STARTED), 1);
}

/// One of them stops the engine whose sink the other one is inside, and that one takes a sink away.
TEST(ShareCaptureEngineRing, OfAStopAndASinkThatIsTakenAwayIsRefusedOnce) {
    CRing ring(2);
    EXPECT_EQ(ring.InFrames([&](std::size_t next) {
        return next == 0 ? ring.Engine(0).Stop() : ring.Engine(1).SetSink(nullptr);
    }),
              OneRefusal(2));
}

TEST(ShareCaptureEngineRing, IsNoneWhereALineOfEnginesEndsTheNextOne) {
    CRing ring(4);
    EXPECT_EQ(ring.InFrames([&](std::size_t next) { return next == 0 ? 0 : ring.Engine(next).Stop(); }),
              (Results{0, 0, 0, 0}));
    EXPECT_EQ(ring.CountOf(SHARE_CAPTURE_ENGINE_STATUS_STOPPED), 3);
    EXPECT_TRUE(ring.trace.LinesContaining("waits for this thread").empty());
}

TEST(ShareCaptureEngineRing, IsForgottenWhenTheWaitIsOver) {
    CRing ring(2);
    EXPECT_EQ(ring.InFrames([&](std::size_t next) { return ring.Engine(next).Stop(); }), OneRefusal(2));
    EXPECT_EQ(ring.Engine(0).Stop(), 0);
    EXPECT_EQ(ring.Engine(1).Stop(), 0);
    EXPECT_EQ(ring.CountOf(SHARE_CAPTURE_ENGINE_STATUS_STOPPED), 2);
}
