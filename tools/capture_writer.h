// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/capture_output.h"

#include <screenshare/share_frame.h>

#include <cstdint>
#include <functional>
#include <string>

/// Takes a line for people. Called on the thread that writes.
using NoteReceiver = std::function<void(const std::string&)>;

/// Puts delivered frames somewhere.
/// Threads: one at a time. Errors: told by the results; after one, nothing more is written. std::bad_alloc.
class FrameWriter {
public:
    virtual ~FrameWriter() = default;

    /// Makes ready what frames go into.
    virtual WriteResult Open() { return std::nullopt; }
    /// A frame with at least one pixel, to be read during the call only.
    virtual WriteResult Write(IShareFrame& frame) = 0;
    /// The end; `timestamp` is its time, as frames have it.
    virtual WriteResult Finish(unsigned timestamp) = 0;

    /// How many frames the output has.
    std::int64_t FrameCount() const { return m_frames; }
    virtual std::uint64_t BytesWritten() const { return 0; }
    /// See CaptureOutput::PipeDescriptor.
    virtual int PipeDescriptor() const { return -1; }

protected:
    FrameWriter() = default;
    FrameWriter(const FrameWriter&) = default;
    FrameWriter& operator=(const FrameWriter&) = default;

    std::int64_t m_frames = 0;
};

/// Only counts them.
class FrameCounter : public FrameWriter {
public:
    WriteResult Write(IShareFrame&) override {
        ++m_frames;
        return std::nullopt;
    }
    WriteResult Finish(unsigned) override { return std::nullopt; }
};
