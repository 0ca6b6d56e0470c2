// SPDX-License-Identifier: Apache-2.0
#include "platform/simulated/simulated_stream.h"

#include "util/cm_guarded_call.h"

#include <utility>

namespace platform {

SimulatedStream::SimulatedStream(std::shared_ptr<Desk> desk, std::shared_ptr<Desk::Reader> reader)
    : m_desk(std::move(desk)),
      m_reader(std::move(reader)),
      m_id(m_reader->id) {}

SimulatedStream::~SimulatedStream() {
    m_desk->Close(m_reader);
}

DisplayPictureResult SimulatedStream::TakeNewest(std::chrono::nanoseconds deadline) {
    DisplayPictureResult result;
    const bool done = CmCallGuarded("[SimulatedStream::TakeNewest]>>exception: ",
                                    [&] { result = m_desk->TakeNewest(*m_reader, deadline); });
    m_desk->Wake();
    return done ? result : DisplayPictureResult{PictureOutcome::Failed, nullptr};
}

} // namespace platform
