// SPDX-License-Identifier: Apache-2.0
#include "tools/desktop_state.h"

#include "platform/window_server.h"

namespace {

std::string Problem(const std::string& what) {
    return what + " (screenshare doctor tells more)";
}

std::string ProblemOfLife(platform::Life life, const std::string& lost) {
    switch (life) {
        case platform::Life::Alive:
            return "";
        case platform::Life::Stalled:
            return Problem("the window server does not answer");
        case platform::Life::Lost:
            break;
    }
    return Problem(lost);
}

platform::LifeState LifeNow() {
    return platform::CurrentWindowServer()->GetLife();
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
    return problem.empty() ? ProblemOfLife(LifeNow().life, "no window server answers") : problem;
}

DesktopLook::DesktopLook() : m_epoch(LifeNow().epoch) {}

std::string DesktopLook::ProblemSince() const {
    const std::string gone = "the window server went away";
    const platform::LifeState now = LifeNow();
    return now.epoch == m_epoch ? ProblemOfLife(now.life, gone) : Problem(gone);
}
