// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/capture_writer.h"

#include <screenshare/share_types.h>

#include <string>
#include <vector>

/// A YUV4MPEG2 stream, for encoders. Such a stream has one rate and one size. So each picture is repeated for
/// as long as it was to be seen, one that comes before its turn is left out unless it stays, and pictures of
/// another size than the first are scaled into it, with their proportions, on black.
class Y4mWriter : public FrameWriter {
public:
    struct Form {
        unsigned fps = 30;
        std::int64_t frameLimit = 0; ///< Frames of the stream, repeated ones too; 0 for none.
    };

    Y4mWriter(std::string file, const Form& form, const StopFlag& stop)
        : m_file(std::move(file)),
          m_form(form),
          m_output(stop) {}

    WriteResult Open() override { return m_output.Open(m_file); }
    WriteResult Write(IShareFrame& frame) override;
    /// Repeats the last picture up to the end.
    WriteResult Finish(unsigned timestamp) override;
    std::uint64_t BytesWritten() const override { return m_output.BytesWritten(); }
    int PipeDescriptor() const override { return m_output.PipeDescriptor(); }

private:
    WriteResult Begin(IShareFrame& frame, TVLSize size);
    void PassTimeTo(unsigned timestamp);
    std::int64_t DueFrames() const;
    bool Convert(IShareFrame& frame, TVLSize size);
    bool ConvertExactly(IShareFrame& frame);
    bool ConvertFitted(IShareFrame& frame, TVLSize size);
    WriteResult RepeatUntilDue();
    WriteResult WritePicture();

    const std::string m_file;
    const Form m_form;
    CaptureOutput m_output;
    TVLSize m_size{}; // of the stream; none before the first frame
    std::uint64_t m_elapsedMs = 0;
    unsigned m_timestamp = 0;
    std::vector<std::uint8_t> m_planes; // of the last picture
};
