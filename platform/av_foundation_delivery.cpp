// SPDX-License-Identifier: Apache-2.0
#include "platform/av_foundation_delivery.h"

#include <algorithm>
#include <functional>
#include <utility>

namespace platform {

namespace {

constinit thread_local int t_insideDepth = 0;

} // namespace

InsideSessionScope::InsideSessionScope() {
    ++t_insideDepth;
}

InsideSessionScope::~InsideSessionScope() {
    --t_insideDepth;
}

bool IsInsideSession() {
    return t_insideDepth > 0;
}

/// Counts a call that runs, until its end, however it ends.
class SampleDelivery::Call {
public:
    /// Begun with the delivery's lock held.
    explicit Call(SampleDelivery& delivery) : m_delivery(delivery) { ++m_delivery.m_calls; }
    ~Call() {
        const std::lock_guard<std::mutex> lock(m_delivery.m_mutex);
        --m_delivery.m_calls;
        m_delivery.m_callEnded.notify_all();
    }
    Call(const Call&) = delete;
    Call& operator=(const Call&) = delete;

private:
    SampleDelivery& m_delivery;
};

void SampleDelivery::Deliver(SampleTarget target, CMSampleBufferRef sample, bool discardsLate) {
    const dispatch_queue_t queue = target.queue;
    if (queue == nullptr)
        return;
    // Made before the sample waits, or without memory it would wait for a block that never comes.
    std::function<void()> block = [self = shared_from_this(), raw = queue.get()] { self->RunNext(raw); };
    const CMSampleBufferRef delivered = sample;
    std::list<Parcel> late; // ends behind the lock
    bool hasBlock = false;
    {
        const std::lock_guard<std::mutex> lock(m_mutex);
        if (m_closed)
            return;
        if (discardsLate) {
            late.swap(m_waiting);
            hasBlock = std::any_of(late.begin(), late.end(),
                                   [&queue](const Parcel& each) { return each.target.queue == queue; });
        }
        m_waiting.push_back({std::move(target), std::move(sample)});
    }
    if (!hasBlock && !dispatch_async(queue, std::move(block)))
        Drop(delivered);
}

void SampleDelivery::Drop(const CMSampleBufferRef& sample) {
    std::list<Parcel> dropped; // ends behind the lock
    const std::lock_guard<std::mutex> lock(m_mutex);
    const auto place = std::find_if(m_waiting.begin(), m_waiting.end(),
                                    [&](const Parcel& each) { return each.sample == sample; });
    if (place != m_waiting.end())
        dropped.splice(dropped.end(), m_waiting, place);
}

void SampleDelivery::DeliverInstead(const CMSampleBufferRef& former, SampleTarget target,
                                    CMSampleBufferRef sample, bool discardsLate) {
    Parcel parcel{std::move(target), std::move(sample)};
    if (!Exchange(former, parcel))
        Deliver(std::move(parcel.target), std::move(parcel.sample), discardsLate);
}

/// Leaves what was there in `parcel`, to end behind the lock.
bool SampleDelivery::Exchange(const CMSampleBufferRef& former, Parcel& parcel) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    const auto place = std::find_if(m_waiting.begin(), m_waiting.end(), [&](const Parcel& each) {
        return each.sample == former && each.target.queue == parcel.target.queue;
    });
    if (place == m_waiting.end())
        return false;
    std::swap(*place, parcel);
    return true;
}

void SampleDelivery::RunNext(const DispatchQueue* queue) {
    std::unique_lock<std::mutex> lock(m_mutex);
    const auto next = std::find_if(m_waiting.begin(), m_waiting.end(),
                                   [queue](const Parcel& each) { return each.target.queue.get() == queue; });
    if (next == m_waiting.end())
        return;
    const Call call(*this);
    const InsideSessionScope inside;
    const Parcel parcel = std::move(*next);
    m_waiting.erase(next);
    lock.unlock();
    if (const auto delegate = parcel.target.delegate.lock())
        delegate->captureOutput(parcel.target.output.get(), parcel.sample, parcel.target.connection.get());
}

bool SampleDelivery::HasWaiting() const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return !m_waiting.empty();
}

void SampleDelivery::Close() {
    std::list<Parcel> dropped; // ends behind the lock
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_closed = true;
    dropped.swap(m_waiting);
}

void SampleDelivery::WaitForCalls() {
    std::unique_lock<std::mutex> lock(m_mutex);
    m_callEnded.wait(lock, [this] { return m_calls == 0; });
}

} // namespace platform
