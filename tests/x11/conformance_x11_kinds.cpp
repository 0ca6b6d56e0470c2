// SPDX-License-Identifier: Apache-2.0
#include "tests/support/sanitizer.h"
#include "tests/support/test_effort.h"
#include "tests/x11/x11_desk.h"

#include <cstdlib>
#include <iostream>

/// The desktops on which the conformance cases (tests/platform) are run for X11.

namespace {

using Kind = XServerOptions::Kind;
using Manager = X11DeskOptions::Manager;

/// Small, since cases look at every pixel.
XServerOptions Small(Kind kind, int depth = 24) {
    return {.kind = kind, .width = 640, .height = 480, .depth = depth};
}

const X11DeskOptions XORG_OPENBOX{Small(Kind::Xorg), Manager::Openbox};
const X11DeskOptions XVFB_BARE{Small(Kind::Xvfb)};
const X11DeskOptions XORG_OPENBOX_PICOM{Small(Kind::Xorg), Manager::Openbox, true};
const X11DeskOptions XORG_OPENBOX_TINT2{Small(Kind::Xorg), Manager::Openbox, false, true};
const X11DeskOptions XORG_MUTTER{Small(Kind::Xorg), Manager::Mutter};
const X11DeskOptions XVFB_16_BIT{Small(Kind::Xvfb, 16)};
const X11DeskOptions XVFB_30_BIT{Small(Kind::Xvfb, 30)};

template <const X11DeskOptions& Options>
std::unique_ptr<ConformanceDesk> Make() {
    if (const auto missing = MissingProgram(Options.Programs())) {
        std::cout << *missing << "\n";
        return nullptr;
    }
    return std::make_unique<X11Desk>(Options);
}

bool WantsMatrix() {
    return TestEffort() > 1 || std::getenv("SCREENSHARE_X11_MATRIX") != nullptr;
}

} // namespace

std::vector<ConformanceKind> ConformanceKinds() {
    std::vector<ConformanceKind> kinds{{"x11_xorg_openbox", "x11", Make<XORG_OPENBOX>}};
    // What another desktop shows to a sanitizer isn't worth its time.
    if (SCREENSHARE_TEST_SANITIZED == 0)
        kinds.push_back({"x11_xvfb_bare", "x11", Make<XVFB_BARE>});
    if (WantsMatrix())
        kinds.insert(kinds.end(), {{"x11_xvfb_16_bit", "x11", Make<XVFB_16_BIT>},
                                   {"x11_xvfb_30_bit", "x11", Make<XVFB_30_BIT>},
                                   {"x11_xorg_openbox_picom", "x11", Make<XORG_OPENBOX_PICOM>},
                                   {"x11_xorg_openbox_tint2", "x11", Make<XORG_OPENBOX_TINT2>},
                                   {"x11_xorg_mutter", "x11", Make<XORG_MUTTER>}});
    return kinds;
}
