// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/share_source.h"

#include <memory>

/// A source that looks its name up when somebody asks for it first, and keeps it: the name of a display for a
/// monitor, of the running application for an application.
/// Threads: GetName may be called by several at once.
class CShareSourceMac : public CShareSource {
public:
    CShareSourceMac() = default;
    ~CShareSourceMac() override = default;

    int GetName(char* out, int length) override;

private:
    using Text = std::unique_ptr<char[]>;

    /// The name kept, after a look-up if need be; null when there is none to be had.
    const char* KeptName();
    /// A buffer of SHARE_SOURCE_TEXT_SIZE bytes; null when there is no name.
    Text LookUpName() const;
};

class CShareSourceUtilMac {
public:
    virtual ~CShareSourceUtilMac() = default;

    /// The name of a running application in UTF-8, cut at `length` bytes. `out` must hold `length` + 1 bytes:
    /// the copy, which has a terminator of its own when the name is shorter, is ended once more behind its
    /// last byte. False, with `out` untouched, for a process that is no running application.
    static bool GetApplicationName(int pid, char* out, int length);
};
