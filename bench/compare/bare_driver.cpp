// SPDX-License-Identifier: Apache-2.0
#include "bench/compare/driver.h"
#include "bench/meter/bare_loop.h"
#include "bench/meter/watching_loop.h"

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <memory>
#include <stdexcept>
#include <string>

/// Loops as a program of their own: one that fetches whole pictures by shared memory and does nothing with
/// them; with --config=updates one that fetches what has changed of the screen.

namespace {

std::string DisplayName() {
    const char* const name = std::getenv("DISPLAY");
    return name != nullptr ? name : "";
}

class LoopDriver : public Driver {
public:
    int Frames() const override { return m_probe.Frames(); }
    std::uint32_t PixelAt(int x, int y) override { return m_probe.PixelAt(x, y); }
    int ListWindows() override { throw std::logic_error("a loop lists nothing"); }

protected:
    FrameProbe m_probe;
};

class BareDriver final : public LoopDriver {
public:
    explicit BareDriver(const DriverPlan& plan)
        : m_loop(DisplayName(), plan.window, [this](const SharedPicture& picture) {
              m_probe.Saw(reinterpret_cast<const std::uint8_t*>(picture.Pixels()),
                          std::ptrdiff_t{4} * picture.Width());
          }) {}

private:
    const BareLoop m_loop;
};

class WatchingDriver final : public LoopDriver {
public:
    WatchingDriver()
        : m_loop(DisplayName(), [this](const std::uint32_t* pixels, int width) {
              m_probe.Saw(reinterpret_cast<const std::uint8_t*>(pixels), std::ptrdiff_t{4} * width,
                          FrameProbe::Order::RedFirst);
          }) {}

private:
    const WatchingLoop m_loop;
};

std::unique_ptr<Driver> MakeDriver(const DriverPlan& plan) {
    if (plan.config.empty())
        return std::make_unique<BareDriver>(plan);
    if (plan.config != "updates" || plan.window != 0)
        throw std::invalid_argument("the watching loop looks at the screen");
    return std::make_unique<WatchingDriver>();
}

} // namespace

int main(int argc, char** argv) {
    return RunDriver(argc, argv, MakeDriver);
}
