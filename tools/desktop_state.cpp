// SPDX-License-Identifier: Apache-2.0
#include "tools/desktop_state.h"

#include "platform/window_server.h"

namespace {

std::string ProblemOfLife(const std::string& lost) {
    switch (platform::CurrentWindowServer()->GetLife().life) {
        case platform::Life::Alive:
            return "";
        case platform::Life::Stalled:
            return "the window server does not answer (screenshare doctor tells more)";
        case platform::Life::Lost:
            break;
    }
    return lost + " (screenshare doctor tells more)";
}

} // namespace

std::string ProblemOfNoDesktop() {
    if (std::string(platform::CurrentWindowServer()->Name()) != "none")
        return "";
    return "there is no desktop to look at (screenshare doctor tells why); --platform simulated shows an "
           "invented one";
}

std::string ProblemBeforeLook() {
    const std::string problem = ProblemOfNoDesktop();
    return problem.empty() ? ProblemOfLife("no window server answers") : problem;
}

std::string ProblemAfterLook() {
    return ProblemOfLife("the window server went away");
}
