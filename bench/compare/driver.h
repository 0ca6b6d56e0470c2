// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <string>

/// The near side of a program that looks at a desktop so that somebody else can measure what that costs. It
/// takes the display from the environment, what to look at from its arguments, and answers a line on its
/// standard input with one on its standard output; it ends when no more lines come.
///
///     (nothing)    ready        once, when the first frames are there
///     frames       COUNT        so far; of several captures, the least
///     pixel X Y    COLOUR       of the next frame, a decimal 0xRRGGBB
///     list TIMES   WINDOWS NS   lists all windows that often; the windows found, and the nanoseconds a list

/// What a driver is asked to look at.
struct DriverPlan {
    std::string config;  ///< In its own words; the way it does by itself when empty.
    unsigned window = 0; ///< The whole screen for 0.
    int captures = 1;    ///< So many at once; none where windows are listed.
};

/// Understands --config=, --window= and --captures=. Throws std::invalid_argument for anything else.
DriverPlan ReadDriverPlan(int argc, const char* const* argv);

/// Sees every frame of one capture where it is delivered.
/// Threads: Saw on the capture's thread, the others on the driver's.
class FrameProbe {
public:
    enum class Order {
        BlueFirst,
        RedFirst,
    };

    /// `pixels` are of four bytes.
    void Saw(const std::uint8_t* pixels, std::ptrdiff_t bytesPerLine, Order order = Order::BlueFirst);

    int Frames() const { return m_frames; }
    /// Of the next frame. Throws std::runtime_error when none comes.
    std::uint32_t PixelAt(int x, int y);

private:
    std::atomic<int> m_frames{0};
    std::atomic<bool> m_wanted{false};
    std::mutex m_mutex;
    std::condition_variable m_answered;
    int m_x = 0;
    int m_y = 0;
    std::uint32_t m_pixel = 0;
};

class Driver {
public:
    virtual ~Driver() = default;
    Driver() = default;
    Driver(const Driver&) = delete;
    Driver& operator=(const Driver&) = delete;

    virtual int Frames() const = 0;
    virtual std::uint32_t PixelAt(int x, int y) = 0;
    /// Once; the windows found. Throws when it can't.
    virtual int ListWindows() = 0;
};

/// The whole of a driver's main. The captures run on from `start` to the end of what it gives.
int RunDriver(int argc, const char* const* argv,
              const std::function<std::unique_ptr<Driver>(const DriverPlan&)>& start);
