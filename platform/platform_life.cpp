// SPDX-License-Identifier: Apache-2.0
#include "platform/platform_life.h"

#include "platform/av_foundation_life.h"
#include "platform/dispatch_pool.h"
#include "platform/notices.h"
#include "platform/platform_thread.h"
#include "platform/window_pins.h"
#include "platform/window_server.h"
#include "util/cm_thread.h"

#include <memory>

namespace platform {

namespace {

/// A host may end, or unload the library, without having released it. Whom its registrations name may be gone
/// by then.
class EndAtExit {
public:
    EndAtExit() = default;
    ~EndAtExit() {
        ForgetNoticeHandlers();
        Rest();
    }
    EndAtExit(const EndAtExit&) = delete;
    EndAtExit& operator=(const EndAtExit&) = delete;
};

const EndAtExit g_endAtExit;

} // namespace

void Rest() noexcept {
    const PlatformRestScope resting;
    // In this order: sessions dispatch work, a handler may, and all of them may call the server.
    RestCaptureSessions();
    RestNotices();
    RestPool();
    ForgetPins();
    if (const std::shared_ptr<WindowServer> server = ChosenWindowServer())
        server->Rest();
    // Those that this or an earlier rest could not wait for.
    if (!OnPlatformThread())
        ACmThread::JoinEnded();
}

void Wake() noexcept {
    WakeNotices();
    WakeCaptureSessions();
}

} // namespace platform
