// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <optional>
#include <string>

namespace platform::x11 {

/// All of a plain file, also of one whose size the system doesn't tell, as in /proc. Nothing when it can't be
/// read or is larger than `limit`. Never waits: what isn't a plain file isn't read.
std::optional<std::string> ReadSmallFile(const std::string& path, std::size_t limit);

} // namespace platform::x11
