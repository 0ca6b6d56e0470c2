// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"
#include "platform/x11/window_properties.h"

#include <vector>

/// In which storey of the stack a window stands. X has one pile of windows and tells what each is for; the
/// storeys are made from that.
namespace platform::x11 {

struct LevelInput {
    WindowType type = WindowType::Unset;
    bool overrideRedirect = false; ///< And not managed in spite of it.
    bool above = false;            ///< Asked to stay above others.
    bool isBackground = false;
    bool onScreen = true;
    CGRect frame;
};

/// Levels of windows that are listed front first. Normal 0; above others 3; menus, pop-ups and bare
/// override-redirect windows 101; tooltips and notifications 102; a dock at a top edge that it fills the main
/// menu's; a dock whose frame lies inside the reserved edge that the Dock's rectangle describes the Dock's;
/// other docks 25. A desktop window is below all only while nothing that is seen, but such windows, lies
/// below it: a window of a negative level counts as covering nobody.
std::vector<int> LevelsOf(const std::vector<LevelInput>& frontFirst, const DisplayList& displays);

} // namespace platform::x11
