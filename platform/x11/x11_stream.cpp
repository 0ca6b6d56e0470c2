// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/x11_stream.h"

#include "platform/x11/x11_session.h"
#include "util/cm_guarded_call.h"

#include <utility>

namespace platform::x11 {

X11Stream::X11Stream(std::shared_ptr<X11Hub> hub, StreamReaderPtr reader)
    : m_hub(std::move(hub)),
      m_reader(std::move(reader)) {}

X11Stream::~X11Stream() {
    CmCallGuarded("[X11Stream::~X11Stream]>>exception: ", [this] { m_hub->Forget(m_reader); });
}

DisplayPictureResult X11Stream::TakeNewest(std::chrono::nanoseconds deadline) {
    DisplayPictureResult result;
    CmCallGuarded("[X11Stream::TakeNewest]>>exception: ", [&] { result = Take(deadline); });
    return result;
}

DisplayPictureResult X11Stream::Take(std::chrono::nanoseconds deadline) {
    const auto taken = std::make_shared<DisplayPictureResult>();
    const PictureOutcome outcome = m_hub->Run(
        deadline, [taken, reader = m_reader](X11Session& session) { *taken = session.TakeNewest(*reader); });
    if (outcome == PictureOutcome::Ok)
        return *taken;
    // Whatever else is wrong: nothing comes back from an epoch that is over.
    if (m_hub->IsOver(m_reader->epoch))
        return {PictureOutcome::Gone, nullptr};
    return {outcome, nullptr};
}

} // namespace platform::x11
