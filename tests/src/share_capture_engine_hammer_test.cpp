// SPDX-License-Identifier: Apache-2.0
#include "tests/support/engine_bench.h"
#include "tests/support/test_effort.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <cstdio>
#include <memory>
#include <random>
#include <string>
#include <thread>
#include <vector>

// Many threads at once.

namespace {

constexpr int THREADS = 4;

/// Looks only at errors: each carries its poster in the top bits and its number below, and each poster's
/// numbers have to come one after the other.
class COrderSink final : public IShareCaptureEngineSink {
public:
    static int Code(int poster, int number) { return poster << 24 | number; }

    void OnCaptureError(int code) override {
        const int poster = code >> 24;
        const int number = code & 0xFFFFFF;
        if (number != m_next[poster]++)
            m_outOfOrder = true;
        if (m_closed)
            m_late = true;
        ++m_count;
    }
    void OnCaptureDisplaySizeChanged(TVLSize) override {}
    void OnCapturedWindowListChanged(const unsigned*, int) override {}
    void OnCaptureStatusChanged(int) override {}
    void OnCaptureData(IShareFrame*, TVLRect&) override {}
    void OnCapturePositionChanged(int, int, int, int) override {}
    void OnCaptureEvent(int, int, void*) override {}

    void Close() { m_closed = true; }
    int Count() const { return m_count; }
    bool IsInOrder() const { return !m_outOfOrder; }
    bool HeardAfterClose() const { return m_late; }

private:
    int m_next[THREADS] = {}; // only under the engine's sink mutex
    std::atomic<int> m_count{0};
    std::atomic<bool> m_closed{false};
    std::atomic<bool> m_outOfOrder{false};
    std::atomic<bool> m_late{false};
};

void PostFrom(int poster, int count, CShareCaptureEngine& engine) {
    for (int i = 0; i < count; ++i)
        engine.OnCaptureError(COrderSink::Code(poster, i));
}

template <class Work>
void RunOnThreads(Work work) {
    std::vector<std::thread> threads;
    for (int i = 0; i < THREADS; ++i)
        threads.emplace_back([&work, i] { work(i); });
    for (std::thread& thread : threads)
        thread.join();
}

} // namespace

TEST(EngineHammer, NotificationsOfFourThreadsToTwoEnginesArriveAllAndInOrder) {
    const int perThread = 25000 * TestEffort();
    std::printf("%d notifications from each of %d threads to each of 2 engines\n", perThread, THREADS);
    CEngineProbe<CShareCaptureEngine> engines[2];
    COrderSink sinks[2];
    for (int i = 0; i < 2; ++i)
        engines[i].SetSink(&sinks[i]);
    RunOnThreads([&](int poster) {
        for (CEngineProbe<CShareCaptureEngine>& engine : engines)
            PostFrom(poster, perThread, engine);
    });
    Settle(*engines[0]._GetAssistThread());
    for (const COrderSink& sink : sinks) {
        EXPECT_EQ(sink.Count(), perThread * THREADS);
        EXPECT_TRUE(sink.IsInOrder());
    }
}

TEST(EngineHammer, NothingArrivesAfterTheSinkWasTakenAway) {
    const int rounds = 200 * TestEffort();
    CEngineProbe<CShareCaptureEngine> engine;
    int heard = 0;
    for (int round = 0; round < rounds; ++round) {
        COrderSink sink;
        engine.SetSink(&sink);
        std::thread poster([&] { PostFrom(0, 200, engine); });
        while (sink.Count() < round % 50)
            std::this_thread::yield();
        engine.SetSink(nullptr);
        sink.Close();
        poster.join();
        Settle(*engine._GetAssistThread());
        EXPECT_FALSE(sink.HeardAfterClose());
        EXPECT_TRUE(sink.IsInOrder());
        heard += sink.Count();
    }
    EXPECT_GT(heard, 0);
    std::printf("%d rounds, %d notifications heard before the sink went\n", rounds, heard);
}

namespace {

/// A sink that calls back into its engine from every callback, and checks the sequence of the status events:
/// each has to differ from the one before, since only changes are told.
class CCallingSink final : public IShareCaptureEngineSink {
public:
    explicit CCallingSink(unsigned seed) : m_random(seed) {}

    void Attach(IShareCaptureEngine* engine) { m_engine = engine; }

    void OnCaptureDisplaySizeChanged(TVLSize) override { CallBack(); }
    void OnCapturedWindowListChanged(const unsigned*, int) override { CallBack(); }
    void OnCaptureStatusChanged(int status) override {
        if (status == m_lastStatus)
            m_doubled = true;
        m_lastStatus = status;
        ++m_statusEvents;
        CallBack();
    }
    void OnCaptureData(IShareFrame*, TVLRect&) override {
        ++m_frames;
        CallBack();
    }
    void OnCaptureError(int) override { CallBack(); }
    void OnCapturePositionChanged(int, int, int, int) override { CallBack(); }
    void OnCaptureEvent(int, int, void*) override { CallBack(); }

    int LastStatus() const { return m_lastStatus; }
    int StatusEvents() const { return m_statusEvents; }
    int Frames() const { return m_frames; }
    bool HeardOneTwice() const { return m_doubled; }
    bool WasLetStop() const { return m_stopped; }

private:
    void CallBack() {
        SHARE_CAPTURE_STATISTIC statistic{};
        switch (m_random() % 9) {
            case 0:
                if (m_engine->Stop() != SHARE_RESULT_FAILED)
                    m_stopped = true;
                break;
            case 1:
                m_engine->Pause();
                break;
            case 2:
                m_engine->Resume();
                break;
            case 3:
                m_engine->Start();
                break;
            case 4:
                m_engine->SetCaptureFps(30);
                break;
            case 5:
                m_engine->SetCaptureMaxFrameSize(100 + static_cast<unsigned>(m_random() % 100), 100);
                break;
            case 6:
                m_engine->SetSink(this);
                break;
            case 7:
                m_engine->GetShareCaptureStatistic(statistic);
                break;
            default:
                m_engine->SetFilterSelf(true);
        }
    }

    IShareCaptureEngine* m_engine = nullptr;
    std::minstd_rand m_random; // as all that is not atomic, only under the engine's sink mutex
    std::atomic<int> m_lastStatus{SHARE_CAPTURE_ENGINE_STATUS_STOPPED};
    std::atomic<int> m_statusEvents{0};
    std::atomic<int> m_frames{0};
    std::atomic<bool> m_doubled{false};
    std::atomic<bool> m_stopped{false};
};

class CSmallCapturer final : public CShareCapturerBase {
public:
    int Capture(IShareFrame* frame) override {
        frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_BGRA);
        frame->SetFrameSize(16, 16);
        const int turn = ++m_turn % 16;
        if (turn == 15)
            return SHARE_CAPTURE_FAILED;
        if (turn == 7)
            return SHARE_CAPTURE_DRAGGING;
        if (turn == 3 && GetSink() != nullptr)
            GetSink()->OnCapturedDisplaySizedChanged({16, 16 + m_turn % 2});
        return SHARE_CAPTURE_OK;
    }
    int SetFPS(int) override { return 0; }
    int SetFilterSelf(bool) override { return 0; }

private:
    int m_turn = 0;
};

struct HammeredEngine {
    explicit HammeredEngine(unsigned seed)
        : sink(seed),
          engine(CreateShareCaptureEngine(SHARE_CAPTURE_ENGINE_TYPE_USER_CUSTOMIZATION)) {
        sink.Attach(engine);
        engine->SetExternalIShareCapturer(&capturer);
        engine->SetSink(&sink);
        engine->SetCaptureFps(30);
    }

    CSmallCapturer capturer;
    CCallingSink sink;
    IShareCaptureEngine* engine;
};

/// Whether frames come after all that; the sink may pause its engine again, so it takes some asking.
bool StillDelivers(HammeredEngine& one) {
    const int before = one.sink.Frames();
    const auto end = std::chrono::steady_clock::now() + PATIENCE;
    while (one.sink.Frames() == before && std::chrono::steady_clock::now() < end) {
        one.engine->Start();
        one.engine->Resume();
        std::this_thread::yield();
    }
    return one.sink.Frames() > before;
}

void CallAtRandom(IShareCaptureEngine& engine, unsigned number) {
    unsigned char on = number & 64 ? 1 : 0;
    switch (number % 10) {
        case 0:
            engine.Start();
            break;
        case 1:
            if (number / 10 % 64 == 0) // often enough, and still frames come
                engine.Stop();
            break;
        case 2:
            engine.Pause();
            break;
        case 3:
            engine.Resume();
            break;
        case 4:
            engine.SetCaptureFps(1 + number % 200);
            break;
        case 5:
            engine.SetCaptureMaxFrameSize(100 + number % 500, 100);
            break;
        case 6:
            engine.Config(SHARE_CAPTURE_ENGINE_CONFIG_CHECK_DUP_FRAME, &on, 1);
            break;
        case 7:
            engine.Config(SHARE_CAPTURE_ENGINE_CONFIG_FORCE_FRAME, &on, 1);
            break;
        case 8:
            engine.SetFilterSelf(on != 0);
            break;
        default:
            engine.AddSharedWindow(1 + number % 5);
    }
}

} // namespace

TEST(EngineHammer, EightEnginesOutliveRandomControlCallsFromFourThreadsAndFromTheirSinks) {
    const unsigned seed = std::random_device{}();
    const auto length = std::chrono::milliseconds(2000) * TestEffort();
    std::printf("seed %u, %lld ms\n", seed, static_cast<long long>(length.count()));
    const std::ptrdiff_t threadsBefore = CountThreadsOfProcess();
    std::vector<std::unique_ptr<HammeredEngine>> engines;
    for (unsigned i = 0; i < 8; ++i) {
        engines.push_back(std::make_unique<HammeredEngine>(seed + i));
        ASSERT_EQ(engines.back()->engine->Start(), 0);
    }
    const auto end = std::chrono::steady_clock::now() + length;
    std::atomic<int> calls{0};
    RunOnThreads([&](int thread) {
        std::minstd_rand random(seed + 100u + static_cast<unsigned>(thread));
        while (std::chrono::steady_clock::now() < end) {
            const auto number = static_cast<unsigned>(random() / 16);
            CallAtRandom(*engines[number / 16 % engines.size()]->engine, number);
            ++calls;
        }
    });
    int frames = 0;
    int statusEvents = 0;
    for (const std::unique_ptr<HammeredEngine>& one : engines) {
        EXPECT_TRUE(StillDelivers(*one));
        EXPECT_EQ(one->engine->Stop(), 0);
        EXPECT_EQ(one->engine->GetCaptureStatus(), SHARE_CAPTURE_ENGINE_STATUS_STOPPED);
        EXPECT_EQ(one->sink.LastStatus(), SHARE_CAPTURE_ENGINE_STATUS_STOPPED) << "a status event was lost";
        EXPECT_FALSE(one->sink.HeardOneTwice());
        EXPECT_FALSE(one->sink.WasLetStop());
        frames += one->sink.Frames();
        statusEvents += one->sink.StatusEvents();
        EXPECT_EQ(DestroyShareCaptureEngine(one->engine), 0);
    }
    EXPECT_GT(frames, 0);
    std::printf("%d calls, %d frames, %d status events\n", calls.load(), frames, statusEvents);
    EXPECT_TRUE(ThreadsComeDownTo(threadsBefore));
}
