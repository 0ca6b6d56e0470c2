// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/simulated/desk.h"

#include <memory>

namespace platform {

/// A stream of a simulated display. It keeps the desk, so that it may outlive the server.
class SimulatedStream final : public DisplayStream {
public:
    SimulatedStream(std::shared_ptr<Desk> desk, std::shared_ptr<Desk::Reader> reader);
    ~SimulatedStream() override;

    std::uint64_t Id() const override { return m_id; }
    DisplayPictureResult TakeNewest(std::chrono::nanoseconds deadline) override;

private:
    const std::shared_ptr<Desk> m_desk;
    const std::shared_ptr<Desk::Reader> m_reader;
    const std::uint64_t m_id;
};

} // namespace platform
