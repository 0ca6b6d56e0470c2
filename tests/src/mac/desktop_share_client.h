// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/share_capture_engine_impl.h"
#include "tests/src/mac/backend_tools.h"
#include "tests/support/recording_sink.h"
#include "tests/support/threads.h"

#include <screenshare/share_engine.h>

#include <gtest/gtest.h>

#include <condition_variable>
#include <cstddef>
#include <functional>
#include <memory>
#include <mutex>
#include <utility>

/// The worker of an engine, by which a test knows that a pass is over.
inline std::shared_ptr<CScreenCaptureTaskThread> WorkerOf(IShareCaptureEngine& engine) {
    struct Reach : CShareCaptureEngine {
        static std::shared_ptr<CScreenCaptureTaskThread> Of(CShareCaptureEngine& other) {
            return (other.*&Reach::_GetWorker)();
        }
    };
    return Reach::Of(dynamic_cast<CShareCaptureEngine&>(engine));
}

/// Comes back when the pass that an engine may be in, paused or not, is over.
inline void EndPass(IShareCaptureEngine& engine) {
    if (const std::shared_ptr<CScreenCaptureTaskThread> worker = WorkerOf(engine))
        Settle(*worker);
}

/// Comes back when a started engine's sink has been told what has happened so far.
inline void EndEvents(IShareCaptureEngine& engine) {
    struct Reach : CShareCaptureEngine {
        static std::shared_ptr<ACmThread> AssistantOf(CShareCaptureEngine& other) {
            return (other.*&Reach::_GetAssistThread)();
        }
    };
    Settle(*Reach::AssistantOf(dynamic_cast<CShareCaptureEngine&>(engine)));
}

/// A copy of a delivered frame, which lives as long as somebody holds it.
struct DeliveredShot {
    FrameRef frame = NewFrameRef();
    IShareFrame::MetaInfo meta{};

    TVLSize Size() const { return SizeOf(*frame.Get()); }
    int Count(std::uint32_t rgb) const { return CountOf(*frame.Get(), rgb); }
    FramePixel At(int x, int y) const { return PixelAt(*frame.Get(), x, y); }
};

/// A client that shares something: an engine made and ended by the exported functions, and what its sink got.
class CShareClient {
public:
    explicit CShareClient(SHARE_CAPTURE_ENGINE_TYPE type = SHARE_CAPTURE_ENGINE_TYPE_DESKTOP)
        : m_engine(CreateShareCaptureEngine(type)) {
        sink.SetFrameHook([this](IShareFrame* frame) {
            DeliveredShot shot;
            shot.frame.Get()->CopyIShareFrame(frame);
            shot.meta = frame->GetMetaInfo();
            const std::lock_guard<std::mutex> lock(m_mutex);
            if (m_watch)
                m_watch(shot);
            m_last = shot;
            ++m_shots;
            m_arrived.notify_all();
        });
    }
    ~CShareClient() { EXPECT_EQ(DestroyShareCaptureEngine(m_engine), 0); }
    CShareClient(const CShareClient&) = delete;
    CShareClient& operator=(const CShareClient&) = delete;

    IShareCaptureEngine* operator->() const { return m_engine; }
    IShareCaptureEngine& operator*() const { return *m_engine; }

    /// As a user picks it from the list of monitors.
    void ShareMonitor(unsigned long display) const {
        IShareSourceEnumerator* const monitors =
            CreateShareSourceEnumerator(SHARE_SOURCE_ENUMERATOR_TYPE_MONITOR, false);
        monitors->Refresh();
        IShareSource* source = nullptr;
        const int found = monitors->GetSourceBySourceId(display, &source);
        EXPECT_EQ(found, 0);
        if (found == 0) {
            EXPECT_EQ(m_engine->AddCaptureShareSource(source), 0);
            source->Release();
        }
        EXPECT_EQ(DestroyShareSourceEnumerator(monitors), 0);
    }
    void Start() {
        EXPECT_EQ(m_engine->SetSink(&sink), 0);
        EXPECT_EQ(m_engine->Start(), 0);
    }

    /// Has `watch` see each frame from now on, one at a time.
    void Watch(std::function<void(const DeliveredShot&)> watch) {
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_watch = std::move(watch);
    }

    /// At least as new as what the sink has noted.
    DeliveredShot Last() const {
        const std::size_t noted = sink.FrameCount();
        std::unique_lock<std::mutex> lock(m_mutex);
        EXPECT_TRUE(m_arrived.wait_for(lock, PATIENCE, [&] { return m_shots >= noted; }));
        return m_last;
    }
    SHARE_CAPTURE_STATISTIC Statistic() const {
        SHARE_CAPTURE_STATISTIC statistic{};
        EXPECT_EQ(m_engine->GetShareCaptureStatistic(statistic), 0);
        return statistic;
    }

private:
    CCallLog m_calls;

public:
    CRecordingSink sink{m_calls};

private:
    mutable std::mutex m_mutex;
    mutable std::condition_variable m_arrived;
    // Guarded by m_mutex.
    std::function<void(const DeliveredShot&)> m_watch;
    DeliveredShot m_last;
    std::size_t m_shots = 0; // noted by the sink and kept here
    IShareCaptureEngine* const m_engine;
};
