// SPDX-License-Identifier: Apache-2.0
#pragma once

/// Marks that the calling thread may be inside a call out of an engine: in a sink's callback, or on a worker.
/// Such a thread must not wait for an engine, its own or another one, which may be waiting for it.
class ShareCallOutMark {
public:
    ShareCallOutMark() { ++Depth(); }
    ~ShareCallOutMark() { --Depth(); }
    ShareCallOutMark(const ShareCallOutMark&) = delete;
    ShareCallOutMark& operator=(const ShareCallOutMark&) = delete;

    static bool IsSet() { return Depth() > 0; }

private:
    static int& Depth() {
        thread_local int depth = 0;
        return depth;
    }
};
