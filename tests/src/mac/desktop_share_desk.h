// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/platform_life.h"
#include "platform/simulated/simulated_window_server.h"
#include "platform/window_server.h"
#include "tests/platform/conformance_desk.h"
#include "tests/platform/conformance_desks.h"
#include "tests/src/mac/desktop_share_client.h"
#include "tests/support/threads.h"

#include <sys/types.h>
#include <chrono>
#include <cstdint>
#include <memory>
#include <optional>
#include <ostream>
#include <thread>
#include <vector>

/// A desktop whose window server is the one in force as long as this lives, and the time that passes on it.
///
/// Cases that drive nothing but this hold on every kind of desktop: what a desktop can't do is skipped, as in
/// the conformance cases, and waiting for passes of an engine is the desktop's own business, since only some
/// of them have a clock that a test moves.
/// Threads: one at a time, beside engines that run on the desktop.
class ShareDesk {
public:
    ShareDesk() = default;
    virtual ~ShareDesk() = default;
    ShareDesk(const ShareDesk&) = delete;
    ShareDesk& operator=(const ShareDesk&) = delete;

    virtual ConformanceDesk& Desk() = 0;

    /// A menu of that application, in front of everything, where no window manager has a say.
    virtual std::optional<platform::CGWindowID> AddPopup(pid_t /*owner*/, const platform::CGRect& /*frame*/,
                                                         std::uint32_t /*rgb*/) {
        return std::nullopt;
    }

    /// Takes away what an application shows for no other reason than to be one.
    virtual void CloseOwnWindow(pid_t /*owner*/) {}

    /// Lets so much time pass for that engine, and the passes that fall due in it.
    virtual void Run(IShareCaptureEngine& engine, std::chrono::milliseconds time) = 0;

    /// Lets some time pass, after which it makes sense to look again.
    virtual void Step(IShareCaptureEngine& engine) { Run(engine, std::chrono::milliseconds(200)); }

    /// Lets time pass until `holds`; false when it still doesn't after PATIENCE of real time.
    template <class Condition>
    [[nodiscard]] bool RunUntil(IShareCaptureEngine& engine, Condition holds) {
        const auto deadline = std::chrono::steady_clock::now() + PATIENCE;
        while (!holds()) {
            if (std::chrono::steady_clock::now() > deadline)
                return false;
            Step(engine);
            std::this_thread::yield(); // notices come on threads of their own
        }
        return true;
    }
};

/// Has the server of a desk be the one in force. Who still uses the server keeps the desk.
class CServedDesk {
public:
    explicit CServedDesk(const std::shared_ptr<ConformanceDesk>& desk)
        : m_former(
              platform::ReplaceWindowServer(std::shared_ptr<platform::WindowServer>(desk, &desk->Server()))) {
    }
    ~CServedDesk() {
        platform::Rest();
        platform::ReplaceWindowServer(m_former);
    }
    CServedDesk(const CServedDesk&) = delete;
    CServedDesk& operator=(const CServedDesk&) = delete;

private:
    const std::shared_ptr<platform::WindowServer> m_former;
};

/// On a clock that stands still but in Run.
class SimulatedShareDesk final : public ShareDesk {
public:
    ConformanceDesk& Desk() override { return *m_desk; }
    std::optional<platform::CGWindowID> AddPopup(pid_t owner, const platform::CGRect& frame,
                                                 std::uint32_t rgb) override {
        const auto window = m_desk->AddWindow(owner, frame, rgb);
        auto& server = dynamic_cast<platform::SimulatedWindowServer&>(m_desk->Server());
        return window && server.SetLevel(*window, POPUP_LEVEL) ? window : std::nullopt;
    }
    void Run(IShareCaptureEngine& engine, std::chrono::milliseconds time) override {
        m_clock->Advance(time);
        if (const std::shared_ptr<CScreenCaptureTaskThread> worker = WorkerOf(engine))
            Settle(*worker);
    }

private:
    static constexpr int POPUP_LEVEL = 101;

    CManualClockScope m_clock; // first: the server goes by it
    const std::shared_ptr<ConformanceDesk> m_desk = std::make_shared<SimulatedDesk>();
    CServedDesk m_served{m_desk};
};

/// One kind of desktop that shares are tried out on.
struct ShareDeskKind {
    const char* name; ///< Letters, digits and underscores.
    /// Null where this machine lacks what it takes; the cases are then skipped.
    std::unique_ptr<ShareDesk> (*make)();
    /// How cases capture that don't say it themselves.
    SCREEN_CAPTURER_TYPE mode = SCREEN_CAPTURER_TYPE_DEFAULT;
};

inline void PrintTo(const ShareDeskKind& kind, std::ostream* out) {
    *out << kind.name;
}

/// Those that are tried out. Each program with the cases brings its own.
std::vector<ShareDeskKind> ShareDeskKinds();
