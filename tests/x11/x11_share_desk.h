// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/src/mac/desktop_share_desk.h"
#include "tests/x11/x11_desk.h"

#include <chrono>
#include <cstdint>
#include <memory>
#include <optional>

/// A real X desktop whose window server is the one in force as long as this lives, in real time.
class X11ShareDesk final : public ShareDesk {
public:
    /// Throws when a program doesn't start.
    explicit X11ShareDesk(const X11DeskOptions& options);

    ConformanceDesk& Desk() override { return *m_desk; }
    std::optional<platform::CGWindowID> AddPopup(pid_t owner, const platform::CGRect& frame,
                                                 std::uint32_t rgb) override;
    void CloseOwnWindow(pid_t owner) override;
    void Run(IShareCaptureEngine& engine, std::chrono::milliseconds time) override;
    void Step(IShareCaptureEngine& engine) override;

private:
    const std::shared_ptr<X11Desk> m_desk;
    CServedDesk m_served{m_desk};
    int m_popups = 0;
};
