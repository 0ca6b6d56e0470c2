// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string_view>

/// Letters for pictures that have to bear words where no library draws them. Threads: any. Nothing throws.
namespace platform {

/// Of each character, in pixels; the space between characters and lines is within.
inline constexpr int BITMAP_FONT_WIDTH = 10;
inline constexpr int BITMAP_FONT_HEIGHT = 20;

/// Whether a pixel of a line of text has ink; (0, 0) is the top left of the first character. No pixel outside
/// the line has. What isn't printable ASCII looks like a question mark, byte by byte.
bool HasInk(std::string_view text, int x, int y) noexcept;

} // namespace platform
