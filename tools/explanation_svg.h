// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/explanation.h"

#include <string>

/// The picture of an explanation, for people: the windows with their verdicts, the regions of the share, a
/// legend, and a table that tells of each window what decided. Colours are told apart by the colour-blind,
/// too, and each has a pattern or a word beside it.
std::string ExplanationSvg(const Explanation& explanation);
