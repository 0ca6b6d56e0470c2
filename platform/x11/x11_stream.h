// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"
#include "platform/x11/x11_hub.h"

#include <memory>

namespace platform::x11 {

/// A stream of a display. It keeps the hub, so that it may outlive the server.
class X11Stream final : public DisplayStream {
public:
    X11Stream(std::shared_ptr<X11Hub> hub, StreamReaderPtr reader);
    ~X11Stream() override;
    X11Stream(const X11Stream&) = delete;
    X11Stream& operator=(const X11Stream&) = delete;

    std::uint64_t Id() const override { return m_reader->id; }
    DisplayPictureResult TakeNewest(std::chrono::nanoseconds deadline) override;

private:
    DisplayPictureResult Take(std::chrono::nanoseconds deadline);

    const std::shared_ptr<X11Hub> m_hub;
    const StreamReaderPtr m_reader;
};

} // namespace platform::x11
