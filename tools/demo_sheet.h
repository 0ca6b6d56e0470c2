// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/cg_image.h"

#include <screenshare/share_types.h>

#include <string>
#include <vector>

/// Pictures side by side, with captions. Units: pixels from the top left of the sheet.

struct SheetPicture {
    std::string title;
    std::string caption;
    platform::CGImageRef image; ///< Null leaves an empty frame.
};

struct SheetPlace {
    int x = 0;
    int y = 0;
    int width = 0;
    int height = 0;

    bool operator==(const SheetPlace&) const = default;
};

struct SheetLayout {
    int width = 0;
    int height = 0;
    std::vector<SheetPlace> pictures; ///< As many as there are sizes; captions stand above.
    SheetPlace text;                  ///< Below the first picture.
};

/// Pictures have one height, but for those that would be too wide and those that are less high; what has no
/// size gets an empty frame. The first one stands above the text, the others right of both in two rows.
SheetLayout LayOutSheet(const std::vector<TVLSize>& sizes);

/// `paragraphs` are broken into lines. Null when memory runs out.
platform::CGImageRef DrawSheet(const std::vector<SheetPicture>& pictures,
                               const std::vector<std::string>& paragraphs);

/// Lines of at most `columns` characters, broken between words; a word that is longer is cut.
std::vector<std::string> BrokenIntoLines(const std::string& paragraph, int columns);
