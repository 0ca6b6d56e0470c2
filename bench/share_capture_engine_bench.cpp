// SPDX-License-Identifier: Apache-2.0
#include "src/share_capture_engine_impl.h"

#include <screenshare/share_capturer_base.h>
#include <screenshare/share_engine.h>

#include <benchmark/benchmark.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <mutex>
#include <new>
#include <vector>

/// What the engine itself costs: a pass around a capturer that does nothing, the comparison of frames, memory
/// in the steady state, and how well the worker keeps its time.

namespace {

std::atomic<long> g_allocations{0};

} // namespace

// Not inlined: a compiler that sees through them holds new and free for a mismatched pair.
[[gnu::noinline]] void* operator new(std::size_t size) {
    g_allocations.fetch_add(1, std::memory_order_relaxed);
    if (void* const memory = std::malloc(size != 0 ? size : 1))
        return memory;
    throw std::bad_alloc();
}

[[gnu::noinline]] void operator delete(void* memory) noexcept {
    std::free(memory);
}

[[gnu::noinline]] void operator delete(void* memory, std::size_t) noexcept {
    std::free(memory);
}

namespace {

using Clock = std::chrono::steady_clock;

/// Leaves the frame as it is, in the size that it was given first.
class CIdleCapturer final : public CShareCapturerBase {
public:
    explicit CIdleCapturer(TVLSize size) : m_size(size) {}

    int Capture(IShareFrame* frame) override {
        if (frame->GetFrameDataFormat() == SHARE_FRAME_FORMAT_NONE) {
            frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_BGRA);
            frame->SetFrameSize(m_size);
        }
        if (m_onCapture != nullptr)
            m_onCapture(m_context);
        return SHARE_CAPTURE_OK;
    }
    bool PointerCaptured() override { return true; }

    void (*m_onCapture)(void*) = nullptr;
    void* m_context = nullptr;

private:
    const TVLSize m_size;
};

class CIdleSink final : public IShareCaptureEngineSink {
public:
    void OnCaptureDisplaySizeChanged(TVLSize) override {}
    void OnCapturedWindowListChanged(const unsigned*, int) override {}
    void OnCaptureStatusChanged(int) override {}
    void OnCaptureData(IShareFrame*, TVLRect&) override {}
    void OnCaptureError(int) override {}
    void OnCapturePositionChanged(int, int, int, int) override {}
    void OnCaptureEvent(int, int, void*) override {}
};

/// An engine whose passes run on the thread of the benchmark: it counts as started and has no worker.
class CBenchedEngine final : public CShareCaptureEngine {
public:
    void BelieveStarted() { m_eSHARE_CAPTURE_ENGINE_STATUS = SHARE_CAPTURE_ENGINE_STATUS_STARTED; }
    IShareFrame* FrameA() { return m_pShareFrameA; }
    IShareFrame* FrameB() { return m_pShareFrameB; }
};

/// Everything that a pass needs, ready to run.
class CPassSetup {
public:
    explicit CPassSetup(TVLSize size) : capturer(size), engine(new CBenchedEngine) {
        engine->SetExternalIShareCapturer(&capturer);
        engine->SetSink(&sink);
        engine->BelieveStarted();
        for (int i = 0; i < 4; ++i)
            Pass();
    }
    ~CPassSetup() { DestroyShareCaptureEngine(engine); }
    CPassSetup(const CPassSetup&) = delete;
    CPassSetup& operator=(const CPassSetup&) = delete;

    void Pass() { CShareCaptureEngine::ThreadRun(engine); }

    CIdleCapturer capturer;
    CIdleSink sink;
    CBenchedEngine* const engine;
};

constexpr TVLSize FULL_HD{1920, 1080};

void BM_PassOfAnIdleCapturer(benchmark::State& state) {
    CPassSetup setup(FULL_HD);
    for (auto _ : state)
        setup.Pass();
}
BENCHMARK(BM_PassOfAnIdleCapturer);

void BM_AllocationsInTheSteadyState(benchmark::State& state) {
    CPassSetup setup(FULL_HD);
    bool check = true;
    if (state.range(0) != 0)
        setup.engine->Config(SHARE_CAPTURE_ENGINE_CONFIG_CHECK_DUP_FRAME, &check, sizeof check);
    const long before = g_allocations.load();
    for (auto _ : state)
        setup.Pass();
    const auto allocated = static_cast<double>(g_allocations.load() - before);
    state.counters["allocations/pass"] = allocated / static_cast<double>(state.iterations());
}
BENCHMARK(BM_AllocationsInTheSteadyState)->ArgName("check_dup")->Arg(0)->Arg(1);

double Microseconds(Clock::duration time) {
    return std::chrono::duration<double, std::micro>(time).count();
}

/// The comparison is taken in turns with a plain memcmp of the same bytes, so that both meet the same
/// machine.
void BM_DuplicateCheckOfAFullHdFrame(benchmark::State& state) {
    CPassSetup setup(FULL_HD);
    bool check = true;
    setup.engine->Config(SHARE_CAPTURE_ENGINE_CONFIG_CHECK_DUP_FRAME, &check, sizeof check);
    setup.Pass();
    const auto length = static_cast<std::size_t>(setup.engine->FrameA()->GetFrameDataLen());
    std::vector<double> passes;
    std::vector<double> compares;
    for (auto _ : state) {
        const auto begin = Clock::now();
        setup.Pass();
        const auto between = Clock::now();
        benchmark::DoNotOptimize(std::memcmp(setup.engine->FrameA()->GetFrameData(),
                                             setup.engine->FrameB()->GetFrameData(), length));
        passes.push_back(Microseconds(between - begin));
        compares.push_back(Microseconds(Clock::now() - between));
    }
    SHARE_CAPTURE_STATISTIC statistic{};
    setup.engine->GetShareCaptureStatistic(statistic);
    if (statistic.nDuplicateFrames < static_cast<int>(state.iterations()))
        state.SkipWithError("the pass has not compared the frames");
    const auto median = [](std::vector<double>& times) {
        const auto middle = times.begin() + static_cast<std::ptrdiff_t>(times.size() / 2);
        std::nth_element(times.begin(), middle, times.end());
        return *middle;
    };
    const double pass = median(passes);
    const double compare = median(compares);
    state.counters["pass_us"] = pass;
    state.counters["memcmp_us"] = compare;
    state.counters["ratio"] = pass / compare;
}
BENCHMARK(BM_DuplicateCheckOfAFullHdFrame)->UseRealTime()->Unit(benchmark::kMicrosecond);

/// The moments at which a worker called its capturer.
class CCadence {
public:
    explicit CCadence(std::size_t count) { m_moments.reserve(count); }

    static void Note(void* self) { static_cast<CCadence*>(self)->Note(); }

    void WaitUntilFull() {
        std::unique_lock<std::mutex> lock(m_mutex);
        m_full.wait(lock, [this] { return IsFull(); });
    }

    /// How far each tick was from the place that the first one gives it, in microseconds.
    std::vector<double> Errors(std::chrono::microseconds period) const {
        std::vector<double> errors;
        for (std::size_t i = 1; i < m_moments.size(); ++i) {
            const auto elapsed = m_moments[i] - m_moments[0];
            const auto ticks = (elapsed + period / 2) / period;
            errors.push_back(std::abs(Microseconds(elapsed - ticks * period)));
        }
        return errors;
    }

    /// What was allocated between the fourth tick and the last.
    double AllocationsPerTick() const {
        return static_cast<double>(m_lastAllocations - m_firstAllocations) /
               static_cast<double>(m_moments.size() - 4);
    }

    /// Ticks that never came between the first and the last.
    double Missed(std::chrono::microseconds period) const {
        const auto elapsed = m_moments.back() - m_moments.front();
        const auto ticks = (elapsed + period / 2) / period;
        return static_cast<double>(ticks) - static_cast<double>(m_moments.size() - 1);
    }

private:
    bool IsFull() const { return m_moments.size() == m_moments.capacity(); }

    void Note() {
        const auto now = Clock::now();
        const std::lock_guard<std::mutex> lock(m_mutex);
        if (IsFull())
            return;
        m_moments.push_back(now);
        m_lastAllocations = g_allocations.load();
        // The first frames still grow what is used over and over.
        if (m_moments.size() == 4)
            m_firstAllocations = m_lastAllocations;
        if (IsFull())
            m_full.notify_all();
    }

    std::mutex m_mutex;
    std::condition_variable m_full;
    // Guarded by m_mutex until it is full.
    std::vector<Clock::time_point> m_moments;
    long m_firstAllocations = 0;
    long m_lastAllocations = 0;
};

double ProcessCpuSeconds() {
    timespec time{};
    clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &time);
    return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_nsec) * 1e-9;
}

void BM_WorkerCadenceOverTenSeconds(benchmark::State& state) {
    constexpr long SECONDS = 10;
    const auto fps = static_cast<unsigned>(state.range(0));
    const std::chrono::microseconds period(1000000 / fps);
    for (auto _ : state) {
        CIdleCapturer capturer({64, 64});
        CIdleSink sink;
        CCadence cadence(fps * SECONDS + 1);
        capturer.m_onCapture = CCadence::Note;
        capturer.m_context = &cadence;
        IShareCaptureEngine* const engine =
            CreateShareCaptureEngine(SHARE_CAPTURE_ENGINE_TYPE_USER_CUSTOMIZATION);
        engine->SetExternalIShareCapturer(&capturer);
        engine->SetSink(&sink);
        engine->SetCaptureFps(fps);
        const double cpuBefore = ProcessCpuSeconds();
        if (engine->Start() != SHARE_RESULT_OK) {
            state.SkipWithError("the engine did not start");
            DestroyShareCaptureEngine(engine);
            return;
        }
        cadence.WaitUntilFull();
        const double cpu = ProcessCpuSeconds() - cpuBefore;
        DestroyShareCaptureEngine(engine);

        const std::vector<double> errors = cadence.Errors(period);
        double sum = 0;
        for (const double error : errors)
            sum += error;
        state.counters["mean_error_us"] = sum / static_cast<double>(errors.size());
        state.counters["worst_error_us"] = *std::max_element(errors.begin(), errors.end());
        state.counters["missed_ticks"] = cadence.Missed(period);
        state.counters["allocations/tick"] = cadence.AllocationsPerTick();
        state.counters["cpu_us/tick"] = cpu * 1e6 / static_cast<double>(errors.size() + 1);
    }
}
BENCHMARK(BM_WorkerCadenceOverTenSeconds)
    ->ArgName("fps")
    ->Arg(30)
    ->Arg(60)
    ->Iterations(1)
    ->UseRealTime()
    ->Unit(benchmark::kMillisecond);

} // namespace
