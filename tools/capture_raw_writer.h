// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/capture_writer.h"

#include <screenshare/share_types.h>

#include <string>
#include <vector>

/// Pixels and nothing else: blue, green, red, alpha, rows from the top without gaps, frame after frame. What
/// a reader has to know is told as a note, before the first frame and before each of another size.
class RawWriter : public FrameWriter {
public:
    RawWriter(std::string file, const StopFlag& stop, NoteReceiver note)
        : m_file(std::move(file)),
          m_output(stop),
          m_note(std::move(note)) {}

    WriteResult Open() override { return m_output.Open(m_file); }
    WriteResult Write(IShareFrame& frame) override;
    WriteResult Finish(unsigned) override { return m_output.Close(); }
    std::uint64_t BytesWritten() const override { return m_output.BytesWritten(); }
    int PipeDescriptor() const override { return m_output.PipeDescriptor(); }

private:
    const std::string m_file;
    CaptureOutput m_output;
    const NoteReceiver m_note;
    TVLSize m_size{};
    std::vector<std::uint8_t> m_pixels;
};
