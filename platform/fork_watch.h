// SPDX-License-Identifier: Apache-2.0
#pragma once

namespace platform {

/// Tells whether the process is a child that was forked from the one in which the object was made. There the
/// other threads are gone, and the locks that they held are never given back.
/// Threads: any.
class ForkWatch {
public:
    ForkWatch();
    bool InChild() const;

private:
    unsigned m_forks;
};

} // namespace platform
