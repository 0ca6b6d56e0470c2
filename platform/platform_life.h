// SPDX-License-Identifier: Apache-2.0
#pragma once

/// The platform's own threads between two uses of the library.
///
/// Threads: any, several at once.
/// Errors:  nothing throws; nothing is traced.
namespace platform {

/// Puts capture sessions to sleep, delivers the notices that are queued, runs the work that is dispatched,
/// and joins the threads that did it; then has the window server end its own. The next call that needs one
/// starts it anew, and registrations stay. Never makes a window server.
///
/// Waits for callbacks and blocks that run, so hold no lock that one of them takes. From inside one, on a
/// thread of the platform, it waits for none: the threads end by themselves when they have done what they
/// had.
void Rest() noexcept;

/// Starts the notice thread again if there are registrations that Rest has left without one, and has capture
/// sessions go on. Any operation of the platform does the former, too: this is for somebody who rested while
/// another one came.
void Wake() noexcept;

} // namespace platform
