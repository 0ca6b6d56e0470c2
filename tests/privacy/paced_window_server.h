// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/support/forwarding_window_server.h"

#include <atomic>
#include <chrono>

/// A window server whose displays can be held as if they stood still: what is new comes later.
class CPacedWindowServer final : public CForwardingWindowServer {
public:
    using CForwardingWindowServer::CForwardingWindowServer;

    void HoldPictures(bool holds) { m_holds = holds; }

protected:
    platform::DisplayPictureResult TakeNewest(platform::DisplayStream& stream,
                                              std::chrono::nanoseconds deadline) override {
        if (m_holds)
            return {platform::PictureOutcome::Nothing, nullptr};
        return CForwardingWindowServer::TakeNewest(stream, deadline);
    }

private:
    std::atomic<bool> m_holds{false};
};
