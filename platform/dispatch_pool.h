// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>

namespace platform {

/// Runs `work` on a thread of the pool, "scn-dispatch", begun in the order of the calls. Threads come with
/// the work, DISPATCH_POOL_THREADS at most, and stay until the pool rests. Without any thread the calling one
/// runs what waits, unless another caller is at that already. `work` must not throw. Throws std::bad_alloc
/// when `work` can't be kept; it was dropped then.
void RunOnPool(std::function<void()> work);

/// Waits until the work has run that was given so far, and what that gives, and joins the threads. On a
/// thread of the platform it waits for nothing, and they end by themselves after that work.
void RestPool() noexcept;

} // namespace platform
