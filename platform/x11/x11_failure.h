// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <exception>

/// What takes the X thread out of whatever it is at, up to its loop. Neither leaves platform/x11.
namespace platform::x11 {

/// The connection is broken.
struct Lost final : std::exception {
    const char* what() const noexcept override { return "the X server is gone"; }
};

/// The server has not answered in time, or the thread is to end.
struct Unanswered final : std::exception {
    const char* what() const noexcept override { return "the X server doesn't answer"; }
};

} // namespace platform::x11
