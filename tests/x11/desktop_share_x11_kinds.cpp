// SPDX-License-Identifier: Apache-2.0
#include "tests/x11/x11_share_desk.h"

#include <iostream>

/// The desktops on which shares of a monitor (tests/src/mac/desktop_share_test.cpp) are tried out for X11.

namespace {

std::unique_ptr<ShareDesk> MakeXorgOpenbox() {
    const X11DeskOptions options{{.kind = XServerOptions::Kind::Xorg, .width = 640, .height = 480},
                                 X11DeskOptions::Manager::Openbox};
    if (const auto missing = MissingProgram(options.Programs())) {
        std::cout << *missing << "\n";
        return nullptr;
    }
    return std::make_unique<X11ShareDesk>(options);
}

} // namespace

std::vector<ShareDeskKind> ShareDeskKinds() {
    return {{"x11_xorg_openbox", MakeXorgOpenbox}};
}
