// SPDX-License-Identifier: Apache-2.0
#include "tools/capture_raw_writer.h"

#include "platform/pixel_rows.h"
#include "src/share_frame.h"

#include <cstddef>
#include <optional>

namespace {

using platform::CGPixelLayout;

/// Those that the library's own ways of capturing deliver.
std::optional<CGPixelLayout> LayoutOf(SHARE_FRAME_FORMAT format) {
    switch (format) {
        case SHARE_FRAME_FORMAT_RGBA:
            return CGPixelLayout::RGBA;
        case SHARE_FRAME_FORMAT_ARGB:
            return CGPixelLayout::ARGB;
        case SHARE_FRAME_FORMAT_RGB:
            return CGPixelLayout::RGB;
        case SHARE_FRAME_FORMAT_BGRA:
            return CGPixelLayout::BGRA;
        default:
            return std::nullopt;
    }
}

/// False for a frame that isn't a whole picture.
bool CopyAsBgra(IShareFrame& frame, TVLSize size, std::vector<std::uint8_t>& pixels) {
    const std::optional<CGPixelLayout> layout = LayoutOf(frame.GetFrameDataFormat());
    if (!layout)
        return false;
    const auto width = static_cast<std::size_t>(size.cx);
    const auto height = static_cast<std::size_t>(size.cy);
    const auto stride = static_cast<std::size_t>(frame.GetFrameLineBytes());
    const std::size_t rowBytes = width * platform::CGBytesPerPixel(*layout);
    const auto length = static_cast<std::size_t>(CShareFrame::BackedDataLen(frame));
    if (stride < rowBytes || stride * (height - 1) + rowBytes > length)
        return false;
    pixels.resize(width * height * 4);
    for (std::size_t y = 0; y < height; ++y)
        platform::ConvertRow(*layout, frame.GetFrameData() + y * stride, CGPixelLayout::BGRA,
                             pixels.data() + y * width * 4, width);
    return true;
}

std::string FormNote(TVLSize size) {
    const std::int64_t line = std::int64_t{size.cx} * 4;
    return "raw frames: " + std::to_string(size.cx) + "x" + std::to_string(size.cy) + " BGRA, " +
           std::to_string(line) + " bytes a line, " + std::to_string(line * size.cy) + " bytes a frame";
}

} // namespace

WriteResult RawWriter::Write(IShareFrame& frame) {
    TVLSize size{};
    frame.GetFrameSize(size);
    if (!CopyAsBgra(frame, size, m_pixels))
        return WriteFailure{EXIT_CODE_FAILED, "a frame has a form that cannot be written"};
    if (size != m_size)
        m_note(FormNote(size));
    m_size = size;
    if (WriteResult failure = m_output.Write(m_pixels.data(), m_pixels.size()))
        return failure;
    ++m_frames;
    return std::nullopt;
}
