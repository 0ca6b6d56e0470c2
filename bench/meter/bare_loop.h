// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "bench/meter/shared_picture.h"
#include "bench/meter/ticking_thread.h"
#include "tests/x11/x11_rig.h"

#include <atomic>
#include <functional>
#include <string>

/// Fetches the root, or a window from its own storage, by shared memory thirty times a second: what every way
/// of taking whole pictures pays at least. Throws std::runtime_error when it can't.
class BareLoop {
public:
    /// `window` 0 stands for the root. `look` is called on the loop's thread with each picture.
    explicit BareLoop(const std::string& display, xcb_window_t window = 0,
                      std::function<void(const SharedPicture&)> look = {});
    BareLoop(const BareLoop&) = delete;
    BareLoop& operator=(const BareLoop&) = delete;

    int FrameCount() const { return m_frames; }

private:
    bool Tick();

    const XLink m_link;
    const xcb_drawable_t m_drawable;
    const SharedPicture m_picture;
    const std::function<void(const SharedPicture&)> m_look;
    std::atomic<int> m_frames{0};
    const TickingThread m_thread; // last: it uses all the others
};
