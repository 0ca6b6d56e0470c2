// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/av_foundation.h"

#include <condition_variable>
#include <list>
#include <memory>
#include <mutex>

namespace platform {

/// Whom samples go to.
struct SampleTarget {
    std::weak_ptr<AVCaptureVideoDataOutputSampleBufferDelegate> delegate;
    dispatch_queue_t queue;
    std::shared_ptr<AVCaptureVideoDataOutput> output;
    std::shared_ptr<AVCaptureConnection> connection;
};

/// Marks the calling thread, for a scope, as one on which a session does its work. What is called there must
/// not wait for a session's thread or for a delegate: they may be waiting for this one.
class InsideSessionScope {
public:
    InsideSessionScope();
    ~InsideSessionScope();
    InsideSessionScope(const InsideSessionScope&) = delete;
    InsideSessionScope& operator=(const InsideSessionScope&) = delete;
};

bool IsInsideSession();

/// The samples of one run, on their way to the delegate's queue.
/// Threads: any; Deliver one at a time. No lock is held while a delegate runs.
class SampleDelivery : public std::enable_shared_from_this<SampleDelivery> {
public:
    /// A sample that was there before and hasn't been given out is dropped if `discardsLate`: what the
    /// delegate gets is always the newest. Throws std::bad_alloc.
    void Deliver(SampleTarget target, CMSampleBufferRef sample, bool discardsLate);

    /// `sample` tells more of the same pixels than `former`: it takes its place if that hasn't been given out
    /// yet, else it is delivered as well. So they are never more than there are pixels.
    void DeliverInstead(const CMSampleBufferRef& former, SampleTarget target, CMSampleBufferRef sample,
                        bool discardsLate);

    /// Whether a sample hasn't been given out yet.
    bool HasWaiting() const;

    /// No call of a delegate begins any more.
    void Close();
    /// Comes back when no call of a delegate runs. Call Close first.
    void WaitForCalls();

private:
    struct Parcel {
        SampleTarget target;
        CMSampleBufferRef sample;
    };
    class Call;

    bool Exchange(const CMSampleBufferRef& former, Parcel& parcel);
    void Drop(const CMSampleBufferRef& sample);
    void RunNext(const DispatchQueue* queue);

    mutable std::mutex m_mutex;
    std::condition_variable m_callEnded;
    // Guarded by m_mutex.
    // For each, a block is on its queue. A list, since an empty one needs no memory: Close must not throw.
    std::list<Parcel> m_waiting;
    int m_calls = 0;
    bool m_closed = false;
};

} // namespace platform
