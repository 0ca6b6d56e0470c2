// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <vector>

namespace platform {

enum NSSearchPathDirectory : unsigned {
    NSDocumentDirectory = 9,
};

enum NSSearchPathDomainMask : unsigned {
    NSUserDomainMask = 1,
};

/// Where the user keeps things of a kind: absolute paths in UTF-8, none with a slash at the end. They need
/// not exist. The documents folder is what the desktop's user-dirs.dirs says, else Documents in the home
/// folder. Empty for any other kind or domain, without a home folder, and when memory runs out. Threads: any,
/// as long as none changes the environment.
std::vector<std::string> NSSearchPathForDirectoriesInDomains(NSSearchPathDirectory directory,
                                                             NSSearchPathDomainMask domains) noexcept;

} // namespace platform
