// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/explanation.h"

#include <string>

/// The explanation as one JSON object, with the windows as `screenshare list windows` tells them.
std::string ExplanationJson(const Explanation& explanation);
