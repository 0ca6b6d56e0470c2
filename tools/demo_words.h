// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/demo_pixels.h"
#include "tools/demo_sheet.h"
#include "tools/demo_shot.h"
#include "tools/demo_subject.h"

#include <string>
#include <vector>

/// What the demo has found, in words.

struct ShownShot {
    DemoShot shot;
    PixelTally tally;
};

struct DemoFindings {
    platform::CGImageRef screen; ///< Null when it can't be seen.
    PixelTally screenTally;
    std::vector<ShownShot> shots;
};

/// The screen first.
std::vector<SheetPicture> DemoPictures(const DemoFindings& findings);

/// What to look at, a sentence or two each.
std::vector<std::string> DemoLessons(const DemoSubject& subject, const DemoFindings& findings);

/// A line for each way of capturing, and one for the screen.
std::string DemoTable(const DemoSubject& subject, const DemoFindings& findings);

/// What must not be: a secret window that shows, or no picture at all. Empty when all is well.
std::string DemoProblem(const DemoSubject& subject, const DemoFindings& findings);

/// Paragraphs as lines for a terminal.
std::string DemoText(const std::vector<std::string>& paragraphs);
