// SPDX-License-Identifier: Apache-2.0
#include "bench/compare/driver.h"
#include "bench/meter/bare_loop.h"

#include <cstdint>
#include <cstdlib>
#include <memory>
#include <stdexcept>

/// The bare loop as a program of its own: whole pictures by shared memory, nothing done with them.

namespace {

class BareDriver final : public Driver {
public:
    explicit BareDriver(const DriverPlan& plan)
        : m_loop(DisplayName(), plan.window, [this](const SharedPicture& picture) {
              m_probe.Saw(reinterpret_cast<const std::uint8_t*>(picture.Pixels()),
                          std::ptrdiff_t{4} * picture.Width());
          }) {}

    int Frames() const override { return m_probe.Frames(); }
    std::uint32_t PixelAt(int x, int y) override { return m_probe.PixelAt(x, y); }
    int ListWindows() override { throw std::logic_error("the bare loop lists nothing"); }

private:
    static std::string DisplayName() {
        const char* const name = std::getenv("DISPLAY");
        return name != nullptr ? name : "";
    }

    FrameProbe m_probe;
    const BareLoop m_loop; // last: it uses the probe
};

} // namespace

int main(int argc, char** argv) {
    return RunDriver(argc, argv, [](const DriverPlan& plan) { return std::make_unique<BareDriver>(plan); });
}
