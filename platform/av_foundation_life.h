// SPDX-License-Identifier: Apache-2.0
#pragma once

/// Capture sessions while the platform rests; see platform/platform_life.h.
/// Threads: any. Nothing throws.
namespace platform {

/// Ends and joins the threads of all sessions; those that run stay running and give no samples. On a thread
/// of the platform it waits for none.
void RestCaptureSessions() noexcept;

/// Has those sessions go on.
void WakeCaptureSessions() noexcept;

} // namespace platform
