// SPDX-License-Identifier: Apache-2.0
#include "src/thumbnail_capture_engine.h"

#include "platform/one_per_process.h"
#include "src/mac/thumbnail_capturer_mac.h"
#include "src/share_util.h"
#include "util/cm_guarded_call.h"
#include "util/cm_thread.h"
#include "util/cm_trace.h"

#include <system_error>
#include <utility>

/// One picture of a job: what the callback is told, and what is captured for it.
struct CThumbnailCaptureEngine::Item {
    unsigned told;
    unsigned captured;
};

/// A job: items that are captured and told in the same way.
struct CThumbnailCaptureEngine::Work {
    std::vector<Item> items;
    bool (CThumbnailCapturer::*capture)(unsigned, ImageData&);
    bool (ThumbnailCallback::*tell)(unsigned, ImageData, bool, bool);
    ThumbnailCallback* callback;
};

class CThumbnailCaptureEngine::Worker : public ACmThread {
public:
    explicit Worker(CThumbnailCaptureEngine& engine) : m_engine(engine) {}

    int OnThreadRun() override {
        m_engine.run();
        return 0;
    }

private:
    CThumbnailCaptureEngine& m_engine;
};

namespace {

using OneEngine = platform::OnePerProcess<CThumbnailCaptureEngine>;

// Made while the library is loaded, so that no fork falls into its making.
[[maybe_unused]] const CThumbnailCaptureEngine& g_engine = OneEngine::Get();

} // namespace

CThumbnailCaptureEngine& CThumbnailCaptureEngine::get() {
    // The object stays, for threads of the client's that cancel while the process ends.
    struct StopAtExit {
        ~StopAtExit() { OneEngine::Get().End(); }
    };
    static const StopAtExit stopAtExit;
    return OneEngine::Get();
}

CThumbnailCaptureEngine::CThumbnailCaptureEngine() = default;

CThumbnailCaptureEngine::~CThumbnailCaptureEngine() {
    End();
}

void CThumbnailCaptureEngine::End() {
    if (m_bStop)
        JoinWorker(); // stopped from inside a callback, it may still be on its way out
    else
        stop();
}

std::unique_ptr<CThumbnailCapturer> CThumbnailCaptureEngine::NewCapturer() {
    return std::make_unique<CThumbnailCapturerMac>();
}

// ---- Requests

bool CThumbnailCaptureEngine::request(ThumbnailCallback* cb) {
    CmTraceInfo("CThumbnailCaptureEngine::request, cb=", static_cast<const void*>(cb));
    return Accept(cb, [cb] {
        return Work{ChooseWindows(), &CThumbnailCapturer::captureWindowImage,
                    &ThumbnailCallback::onAppThumbnail, cb};
    });
}

bool CThumbnailCaptureEngine::requestForApps(const unsigned* pids, int count, ThumbnailCallback* cb) {
    CmTraceInfo("CThumbnailCaptureEngine::requestForApps, count=", count);
    if (cb == nullptr || count < 0)
        return false;
    if (pids == nullptr || count == 0)
        return request(cb);
    return Accept(cb, [pids, count, cb] {
        return Work{ItemsOf(pids, count), &CThumbnailCapturer::captureAppImage,
                    &ThumbnailCallback::onAppThumbnail, cb};
    });
}

bool CThumbnailCaptureEngine::requestForWindows(const unsigned* windows, int count, ThumbnailCallback* cb) {
    CmTraceInfo("CThumbnailCaptureEngine::requestForWindows, count=", count);
    if (windows == nullptr || count <= 0)
        return false;
    return Accept(cb, [windows, count, cb] {
        return Work{ItemsOf(windows, count), &CThumbnailCapturer::captureWindowImage,
                    &ThumbnailCallback::onWindowThumbnail, cb};
    });
}

/// For each process its largest window, of equal ones the one nearest to the front.
std::vector<CThumbnailCaptureEngine::Item> CThumbnailCaptureEngine::ChooseWindows() {
    struct Choice {
        unsigned window;
        int area;
    };
    std::map<unsigned, Choice> choices;
    for (const unsigned window : ListPickerWindows()) {
        const unsigned pid = ShareUtil::GetPIDOfWindowHandle(window);
        TVLRect rect{};
        ShareUtil::GetWindowRect(window, rect);
        const Choice choice{window, ShareUtil::Area(rect)};
        const auto [entry, isNew] = choices.emplace(pid, choice);
        if (!isNew && choice.area > entry->second.area)
            entry->second = choice;
    }
    std::vector<Item> items;
    items.reserve(choices.size());
    for (const auto& [pid, choice] : choices)
        items.push_back({pid, choice.window});
    return items;
}

std::vector<CThumbnailCaptureEngine::Item> CThumbnailCaptureEngine::ItemsOf(const unsigned* ids, int count) {
    std::vector<Item> items;
    items.reserve(static_cast<std::size_t>(count));
    for (int i = 0; i < count; ++i)
        items.push_back({ids[i], ids[i]});
    return items;
}

/// `makeWork` is passed as it is: wrapping it takes memory, and that may fail too.
template <class MakeWork>
bool CThumbnailCaptureEngine::Accept(ThumbnailCallback* cb, const MakeWork& makeWork) {
    if (cb == nullptr)
        return false;
    bool isAccepted = false;
    CmCallGuarded("[CThumbnailCaptureEngine]>>request fail>>", [&] {
        // The windows are looked at before the mutex is taken: nobody waits for the desktop under it.
        isAccepted =
            append(cb, [this, work = makeWork()](CThumbnailCapturer* capturer, std::recursive_mutex& mutex) {
                RunJob(work, *capturer, mutex);
            });
    });
    return isAccepted;
}

bool CThumbnailCaptureEngine::append(ThumbnailCallback* cb, Job job) {
    const std::lock_guard<std::recursive_mutex> lock(m_mutex);
    if (m_bStop)
        return false;
    cancel(cb);
    m_jobs.emplace(cb, std::move(job));
    try {
        launch();
    } catch (...) {
        m_jobs.erase(cb);
        throw;
    }
    return true;
}

void CThumbnailCaptureEngine::cancel(ThumbnailCallback* cb) {
    const std::lock_guard<std::recursive_mutex> lock(m_mutex);
    m_jobs.erase(cb);
    m_failing.erase(cb);
    if (cb != m_pRunning) {
        CmTraceInfo("CThumbnailCaptureEngine::cancel, cb=", static_cast<const void*>(cb));
        return;
    }
    m_bCancelled = true;
    CmTraceInfo("CThumbnailCaptureEngine::cancel, is running, cb=", static_cast<const void*>(cb));
}

void CThumbnailCaptureEngine::stop() {
    CmTraceInfo("CThumbnailCaptureEngine::stop");
    {
        const std::lock_guard<std::recursive_mutex> lock(m_mutex);
        m_bStop = true;
    }
    JoinWorker();
}

/// After a stop: no other worker comes. Not under the mutex, which the worker takes for its next look; on the
/// worker itself it does nothing.
void CThumbnailCaptureEngine::JoinWorker() {
    std::shared_ptr<ACmThread> thread;
    {
        const std::lock_guard<std::recursive_mutex> lock(m_mutex);
        thread = m_thread;
    }
    if (thread != nullptr)
        thread->Join();
}

// ---- The worker

/// Under the mutex. A worker that has set m_bIdle takes it no more, so the wait for its end is a short one.
void CThumbnailCaptureEngine::launch() {
    if (!m_bIdle)
        return;
    if (m_thread != nullptr)
        m_thread->Join();
    m_thread = std::make_shared<Worker>(*this);
    // Only now: the former worker may have set it once more on its way out.
    m_bIdle = false;
    CmTraceInfo("CThumbnailCaptureEngine::launch, try to launch thread");
    if (m_thread->Create("scn-thumbnail", 0, 0, 0) == 0)
        return;
    m_thread.reset();
    m_bIdle = true;
    throw std::system_error(std::make_error_code(std::errc::resource_unavailable_try_again),
                            "thread constructor failed");
}

void CThumbnailCaptureEngine::run() {
    CmTraceInfo("CThumbnailCaptureEngine::run, thread started");
    std::unique_ptr<CThumbnailCapturer> capturer;
    bool isReady = false;
    CmCallGuarded("[CThumbnailCaptureEngine]>>capturer fail>>", [&] {
        capturer = NewCapturer();
        isReady = capturer->init();
    });
    if (!isReady) {
        FailJobs();
        CmTraceInfo("CThumbnailCaptureEngine::run 0, thread exit...");
        return;
    }
    while (RunNextJob(*capturer)) {
    }
    capturer->stop();
    m_bIdle = true;
    CmTraceInfo("CThumbnailCaptureEngine::run, thread exit...");
}

/// Tells all that wait by now. Who asks anew from inside the call waits for the next request.
void CThumbnailCaptureEngine::FailJobs() {
    const std::lock_guard<std::recursive_mutex> lock(m_mutex);
    m_failing.swap(m_jobs);
    // One may cancel another, which then hears nothing any more.
    while (!m_failing.empty()) {
        const auto job = m_failing.extract(m_failing.begin());
        CmCallGuarded("[ThumbnailCallback]>>fail>>", [&] { job.key()->onThumbnailError(-1); });
    }
    m_bIdle = true;
}

/// False when the worker shall end.
bool CThumbnailCaptureEngine::RunNextJob(CThumbnailCapturer& capturer) {
    if (m_bStop)
        return false;
    Job job;
    {
        const std::lock_guard<std::recursive_mutex> lock(m_mutex);
        if (m_jobs.empty()) {
            m_pRunning = nullptr;
            m_bIdle = true;
            return false;
        }
        auto next = m_jobs.extract(m_jobs.begin());
        m_pRunning = next.key();
        job = std::move(next.mapped());
        m_bCancelled = false;
    }
    if (job)
        CmCallGuarded("[CThumbnailCaptureEngine]>>job fail>>", [&] { job(&capturer, m_mutex); });
    return true;
}

void CThumbnailCaptureEngine::RunJob(const Work& work, CThumbnailCapturer& capturer,
                                     std::recursive_mutex& mutex) const {
    for (const Item& item : work.items) {
        if (!RunItem(work, item, &item == &work.items.back(), capturer, mutex))
            return;
    }
}

/// False when the job shall end.
bool CThumbnailCaptureEngine::RunItem(const Work& work, const Item& item, bool last,
                                      CThumbnailCapturer& capturer, std::recursive_mutex& mutex) const {
    if (IsJobEnded())
        return false;
    ImageData image{};
    bool isCaptured = false;
    CmCallGuarded("[CThumbnailCaptureEngine]>>capture fail>>",
                  [&] { isCaptured = (capturer.*work.capture)(item.captured, image); });
    if (!isCaptured)
        image = {};

    const std::lock_guard<std::recursive_mutex> lock(mutex);
    // Whoever cancelled during the capture may have destroyed the callback since.
    if (IsJobEnded())
        return false;
    return (work.callback->*work.tell)(item.told, image, !isCaptured, last);
}
