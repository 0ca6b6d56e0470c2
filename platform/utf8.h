// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>

/// Text that comes from outside, made fit to be passed on. Nothing here trusts its input.
namespace platform {

/// The same text where it is UTF-8; each byte that is no part of a character becomes U+FFFD. Overlong forms,
/// surrogates and what lies beyond the last character are no characters.
std::string MendedUtf8(std::string_view text);

/// Text in which each byte is a character, as UTF-8.
std::string Utf8FromLatin1(std::string_view text);

/// UTF-8 without control characters; runs of them become one space, and none is left at the ends.
std::string WithoutControls(std::string_view utf8);

} // namespace platform
