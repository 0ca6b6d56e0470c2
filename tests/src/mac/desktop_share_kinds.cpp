// SPDX-License-Identifier: Apache-2.0
#include "tests/src/mac/desktop_share_desk.h"

std::vector<ShareDeskKind> ShareDeskKinds() {
    return {{"simulated", [] { return std::unique_ptr<ShareDesk>(std::make_unique<SimulatedShareDesk>()); }}};
}
