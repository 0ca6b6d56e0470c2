// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/share_atomic.h"

#include <screenshare/share_thumbnail.h>

#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <vector>

class ACmThread;
class CThumbnailCapturer;

/// Serves a client's source picker: takes requests for pictures of applications and windows, and answers them
/// one by one on a worker thread of its own. The worker lives as long as there is work.
///
/// Order:    at most one job waits for each callback; that of the lowest address runs first.
/// Threads:  all operations from any thread, a callback's own call included. Captures run without the mutex.
///           A callback is called under it, after a fresh look at the flags, so once cancel has returned
///           there is no further call; cancel, and a request, wait for a call that is under way.
/// Lifetime: stop is final. From inside a callback it does not wait for the worker, whose end the next stop
///           or the destructor waits for. Nobody else may be in a call when the engine is destroyed.
/// Errors:   nothing throws; what fails inside is traced, and refuses the request or fails the item.
class CThumbnailCaptureEngine {
public:
    /// The one of the process. It is stopped at the process's end; a forked child has a fresh one.
    static CThumbnailCaptureEngine& get();

    CThumbnailCaptureEngine();
    virtual ~CThumbnailCaptureEngine();
    CThumbnailCaptureEngine(const CThumbnailCaptureEngine&) = delete;
    CThumbnailCaptureEngine& operator=(const CThumbnailCaptureEngine&) = delete;

    /// All applications with windows on screen, as of now, in the order of their ids. True when accepted.
    bool request(ThumbnailCallback* cb);
    /// No ids are all applications.
    bool requestForApps(const unsigned* pids, int count, ThumbnailCallback* cb);
    bool requestForWindows(const unsigned* windows, int count, ThumbnailCallback* cb);

    void cancel(ThumbnailCallback* cb);
    void stop();

protected:
    using Job = std::function<void(CThumbnailCapturer*, std::recursive_mutex&)>;

    /// Takes the place of the callback's job that waits, and ends the one that runs. Throws when there is no
    /// worker and none can be started; the job is dropped then.
    bool append(ThumbnailCallback* cb, Job job);
    /// Whether the job that runs is to end.
    bool IsJobEnded() const { return m_bCancelled || m_bStop; }

private:
    class Worker;
    struct Item;
    struct Work;

    /// What a run of the worker captures with. Called on the worker, so whoever overrides it has to stop the
    /// engine in a destructor of its own.
    virtual std::unique_ptr<CThumbnailCapturer> NewCapturer();

    static std::vector<Item> ChooseWindows();
    static std::vector<Item> ItemsOf(const unsigned* ids, int count);
    template <class MakeWork>
    bool Accept(ThumbnailCallback* cb, const MakeWork& makeWork);

    void End();
    void JoinWorker();
    void launch();
    void run();
    void FailJobs();
    bool RunNextJob(CThumbnailCapturer& capturer);
    void RunJob(const Work& work, CThumbnailCapturer& capturer, std::recursive_mutex& mutex) const;
    bool RunItem(const Work& work, const Item& item, bool last, CThumbnailCapturer& capturer,
                 std::recursive_mutex& mutex) const;

    std::map<ThumbnailCallback*, Job> m_jobs; // not yet started
    std::recursive_mutex m_mutex;             // guards all but the flags, which are only written under it
    ThumbnailCallback* m_pRunning = nullptr;  // of the job that runs, or ran last
    ShareRelaxed<bool> m_bCancelled{false};   // the running job is to end
    std::shared_ptr<ACmThread> m_thread;      // the worker, perhaps one that has ended
    ShareRelaxed<bool> m_bIdle{true};         // no worker runs
    ShareRelaxed<bool> m_bStop{false};
    std::map<ThumbnailCallback*, Job> m_failing; // waiting to hear that there are no thumbnails
};
