// SPDX-License-Identifier: Apache-2.0
#pragma once

/// Descriptors to wait on. Each is close-on-exec. Errors: std::system_error when there is no descriptor left.

/// Something that is raised once, and then for good. Threads: any.
class StopNotice {
public:
    StopNotice(const StopNotice&) = delete;
    StopNotice& operator=(const StopNotice&) = delete;

    bool IsRaised() const noexcept;
    /// Readable from then on.
    int Descriptor() const { return m_descriptor; }

protected:
    /// Owns the descriptor.
    explicit StopNotice(int descriptor);
    ~StopNotice();

private:
    const int m_descriptor;
};

/// Raised by whoever has it.
class StopFlag : public StopNotice {
public:
    StopFlag();

    void Raise() noexcept;
};

/// Raised by SIGINT and SIGTERM, which it takes off their usual course for the rest of the process, as it
/// takes SIGPIPE out of it: a pipe that closed is then told by write. No code runs in a signal's handler.
/// Threads: made on the main thread; the library's own take no signals.
class StopSignals : public StopNotice {
public:
    StopSignals();
};
