// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

/// Whether there is a window server to look at. Each gives what is wrong, for people; nothing when all is
/// well.

/// Before a look: there may be none at all.
std::string ProblemOfNoDesktop();
/// The same, and it has to answer.
std::string ProblemBeforeLook();
/// After a look that found less than there should be: the server may have gone meanwhile.
std::string ProblemAfterLook();
