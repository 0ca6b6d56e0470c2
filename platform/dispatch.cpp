// SPDX-License-Identifier: Apache-2.0
#include "platform/dispatch.h"

#include "platform/dispatch_pool.h"
#include "util/cm_guarded_call.h"

#include <atomic>
#include <deque>
#include <mutex>
#include <new>
#include <string>
#include <utility>

namespace platform {

class DispatchQueue {
public:
    using Finalizer = void (*)(void* context);

    DispatchQueue(const char* label, dispatch_queue_attr_t attribute)
        : m_label(label != nullptr ? label : ""),
          m_serial(attribute == DISPATCH_QUEUE_SERIAL) {}

    const std::string& Label() const { return m_label; }
    bool IsSerial() const { return m_serial; }

    /// True when the caller is to have RunBlocks called, which nobody else will.
    bool Append(std::function<void()> block);
    /// Runs the blocks of a serial queue one after the other until there is none.
    void RunBlocks();

    std::atomic<void*> context{nullptr};
    std::atomic<Finalizer> finalizer{nullptr};
    DispatchQueue* nextUnfinished = nullptr; ///< Of one that has ended and waits for its finaliser.

private:
    bool TakeNext(std::function<void()>& block);

    const std::string m_label;
    const bool m_serial;

    std::mutex m_mutex;
    // Guarded by m_mutex; for serial queues only.
    std::deque<std::function<void()>> m_blocks;
    bool m_running = false;
};

namespace {

void RunGuarded(const std::function<void()>& block) {
    CmCallGuarded("[DispatchQueue]>>exception from a block: ", block);
}

/// A block of a concurrent queue, which it keeps until what the block held has ended.
struct ConcurrentBlock {
    dispatch_queue_t queue;
    std::function<void()> block;

    void operator()() {
        RunGuarded(block);
        block = nullptr;
    }
};

void StartSerialQueue(const dispatch_queue_t& queue) {
    try {
        RunOnPool([queue] { queue->RunBlocks(); });
    } catch (const std::bad_alloc&) {
        queue->RunBlocks();
    }
}

/// Queues that ended when there was no memory to have their finalisers run, the last one first.
std::atomic<DispatchQueue*> g_unfinished{nullptr};

void AddUnfinished(DispatchQueue* queue) {
    queue->nextUnfinished = g_unfinished.load();
    while (!g_unfinished.compare_exchange_weak(queue->nextUnfinished, queue)) {
    }
}

/// False without memory; the queue is still there then.
bool Finish(DispatchQueue* queue) {
    const bool isPosted = CmCallGuarded("[DispatchQueue]>>finaliser not run yet: ", [&] {
        RunOnPool([finalizer = queue->finalizer.load(), context = queue->context.load()] {
            CmCallGuarded("[DispatchQueue]>>exception from a finaliser: ", [&] { finalizer(context); });
        });
    });
    if (isPosted)
        delete queue;
    return isPosted;
}

/// Those that ended without memory, now that there may be some.
void FinishEarlierOnes() {
    DispatchQueue* queue = g_unfinished.exchange(nullptr);
    while (queue != nullptr) {
        DispatchQueue* const next = queue->nextUnfinished;
        if (!Finish(queue))
            AddUnfinished(queue);
        queue = next;
    }
}

/// What a shared queue ends with, on whichever thread its last share goes.
void EndQueue(DispatchQueue* queue) {
    FinishEarlierOnes();
    if (queue->context.load() == nullptr || queue->finalizer.load() == nullptr)
        delete queue;
    else if (!Finish(queue))
        AddUnfinished(queue);
}

} // namespace

bool DispatchQueue::Append(std::function<void()> block) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_blocks.push_back(std::move(block));
    return !std::exchange(m_running, true);
}

bool DispatchQueue::TakeNext(std::function<void()>& block) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_running = !m_blocks.empty();
    if (!m_running)
        return false;
    block = std::move(m_blocks.front());
    m_blocks.pop_front();
    return true;
}

void DispatchQueue::RunBlocks() {
    std::function<void()> block;
    while (TakeNext(block)) {
        RunGuarded(block);
        block = nullptr; // what it held ends here, with no lock held
    }
}

dispatch_queue_t dispatch_queue_create(const char* label, dispatch_queue_attr_t attribute) noexcept {
    FinishEarlierOnes();
    dispatch_queue_t queue;
    CmCallGuarded("[dispatch_queue_create]>>exception: ", [&] {
        queue = dispatch_queue_t(new DispatchQueue(label, attribute), EndQueue); // NOLINT: guarded
    });
    return queue;
}

const char* dispatch_queue_get_label(const dispatch_queue_t& queue) noexcept {
    return queue != nullptr ? queue->Label().c_str() : "";
}

bool dispatch_async(const dispatch_queue_t& queue, std::function<void()> block) noexcept {
    if (queue == nullptr || block == nullptr)
        return false;
    return CmCallGuarded("[dispatch_async]>>block dropped: ", [&] {
        if (!queue->IsSerial())
            RunOnPool(ConcurrentBlock{queue, std::move(block)});
        else if (queue->Append(std::move(block)))
            StartSerialQueue(queue);
    });
}

void dispatch_set_context(const dispatch_queue_t& queue, void* context) noexcept {
    if (queue != nullptr)
        queue->context = context;
}

void* dispatch_get_context(const dispatch_queue_t& queue) noexcept {
    return queue != nullptr ? queue->context.load() : nullptr;
}

void dispatch_set_finalizer_f(const dispatch_queue_t& queue, void (*finalizer)(void* context)) noexcept {
    if (queue != nullptr)
        queue->finalizer = finalizer;
}

void dispatch_release(dispatch_queue_t& queue) noexcept {
    queue.reset();
}

} // namespace platform
