// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/capture_signals.h"
#include "tools/exit_code.h"

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>

/// Why something can't be written any more.
struct WriteFailure {
    ExitCode code = EXIT_CODE_NOT_WRITTEN;
    std::string text; ///< For people.
};
/// Nothing when all is well.
using WriteResult = std::optional<WriteFailure>;

/// A failure with what errno says; a closed pipe has a code of its own.
WriteFailure FailureFromErrno(const std::string& what, int error);

/// A file or pipe that is written into, unbuffered. A reader that is slow makes the writer wait; one that
/// takes nothing for a second while the end is asked for is given up. Threads: one at a time. Lifetime: the
/// notice stays longer.
class CaptureOutput {
public:
    explicit CaptureOutput(const StopNotice& stop) : m_stop(stop) {}
    ~CaptureOutput();
    CaptureOutput(const CaptureOutput&) = delete;
    CaptureOutput& operator=(const CaptureOutput&) = delete;

    /// "-" is standard output; a file is replaced. Once.
    WriteResult Open(const std::string& file);
    WriteResult Write(const void* data, std::size_t size);
    /// What the system has only taken may still fail. Nothing can be written afterwards.
    WriteResult Close();

    std::uint64_t BytesWritten() const { return m_bytes; }
    /// For poll, which tells by POLLERR when a pipe's reader goes; -1 for anything but a pipe.
    int PipeDescriptor() const { return m_isPipe ? m_descriptor : -1; }

private:
    bool WaitUntilWritable() const;
    WriteFailure Failure(int error) const;

    const StopNotice& m_stop;
    std::string m_name;
    int m_descriptor = -1;
    bool m_isOwn = false;   // and not standard output
    bool m_isPlain = false; // always writable
    bool m_isPipe = false;
    std::uint64_t m_bytes = 0;
};
