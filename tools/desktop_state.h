// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>

/// Whether there is a window server to look at. Each gives what is wrong, for people; nothing when all is
/// well.

/// Before a look: there may be none at all.
std::string ProblemOfNoDesktop();
/// The same, and it has to answer.
std::string ProblemBeforeLook();

/// A look at the desktop that may find less than there should be because the server goes away meanwhile.
class DesktopLook {
public:
    /// Begins it.
    DesktopLook();
    /// What is wrong since then. A server that has come back is another one: what was looked for went with
    /// the first.
    std::string ProblemSince() const;

private:
    const std::uint64_t m_epoch;
};
