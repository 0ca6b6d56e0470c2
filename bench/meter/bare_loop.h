// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "bench/meter/shared_picture.h"
#include "tests/x11/x11_rig.h"

#include <atomic>
#include <functional>
#include <string>
#include <thread>

/// Fetches the root, or a window from its own storage, by shared memory thirty times a second: what every way
/// of taking whole pictures pays at least. Throws std::runtime_error when it can't.
class BareLoop {
public:
    /// `window` 0 stands for the root. `look` is called on the loop's thread with each picture.
    explicit BareLoop(const std::string& display, xcb_window_t window = 0,
                      std::function<void(const SharedPicture&)> look = {});
    ~BareLoop();
    BareLoop(const BareLoop&) = delete;
    BareLoop& operator=(const BareLoop&) = delete;

    int FrameCount() const { return m_frames; }

private:
    void Run();

    const XLink m_link;
    const xcb_drawable_t m_drawable;
    const SharedPicture m_picture;
    const std::function<void(const SharedPicture&)> m_look;
    std::atomic<bool> m_ended{false};
    std::atomic<int> m_frames{0};
    std::thread m_thread; // last: it uses all the others
};
