// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <memory>

/// Queues of work that run on a pool of threads of the platform.
///
/// Threads:  any. Blocks run on the pool's threads, which block every signal; of the blocks that all queues
///           have ready, at most DISPATCH_POOL_THREADS run at once. What a block throws is traced and goes no
///           further.
/// Lifetime: whoever shares a queue keeps it, and so does each block of it that has not run yet: dropping the
///           last share drops no work and waits for nothing, whichever thread does it.
/// Errors:   without memory there is no queue, and a block that can't be kept is dropped with a trace at
///           ERROR. When no thread can be started, a block waits for one of the pool that is free; when the
///           pool has none at all, the thread that dispatches runs what is ready before it comes back. So
///           don't dispatch under a lock that a block takes.
namespace platform {

class DispatchQueue;
/// Null is no queue; operations on it do nothing.
using dispatch_queue_t = std::shared_ptr<DispatchQueue>;

inline constexpr int DISPATCH_POOL_THREADS = 8;

enum dispatch_queue_attr_t : int {
    DISPATCH_QUEUE_SERIAL,     ///< One block at a time, in order.
    DISPATCH_QUEUE_CONCURRENT, ///< Blocks begin in order and run beside each other.
};

/// Null without memory. A null label is an empty one.
dispatch_queue_t dispatch_queue_create(const char* label, dispatch_queue_attr_t attribute) noexcept;

/// Never null; lives as long as the queue.
const char* dispatch_queue_get_label(const dispatch_queue_t& queue) noexcept;

/// Takes the block in and returns; it runs later on a thread of the pool. False when it never will: for a
/// null argument, and when there is no memory to keep it.
bool dispatch_async(const dispatch_queue_t& queue, std::function<void()> block) noexcept;

/// A pointer of the queue's owner, null at first. Nothing here follows it.
void dispatch_set_context(const dispatch_queue_t& queue, void* context) noexcept;
void* dispatch_get_context(const dispatch_queue_t& queue) noexcept;

/// Called once with the context on a thread of the pool, when the last share is gone and every block has run.
/// Not called while the context is null.
void dispatch_set_finalizer_f(const dispatch_queue_t& queue, void (*finalizer)(void* context)) noexcept;

/// Gives a share up; the handle is null after it.
void dispatch_release(dispatch_queue_t& queue) noexcept;

} // namespace platform
