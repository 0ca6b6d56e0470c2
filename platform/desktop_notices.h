// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"

#include <vector>

/// What a window server tells, derived from the difference to what it has told before: so a notice can be
/// neither forgotten nor doubled.
namespace platform {

/// Of the step from one list to another, in order: removals, additions, changes.
std::vector<Notice> DisplayNotices(const DisplayList& before, const DisplayList& after);

/// Launches and ends, in order: ends, launches.
std::vector<Notice> ApplicationNotices(const ApplicationList& before, const ApplicationList& after);

} // namespace platform
