// SPDX-License-Identifier: Apache-2.0
#include "tests/platform/conformance_desks.h"

std::vector<ConformanceKind> ConformanceKinds() {
    return {{"none", "none", MakeConformanceDesk<NoneDesk>},
            {"simulated", "simulated", MakeConformanceDesk<SimulatedDesk>}};
}
