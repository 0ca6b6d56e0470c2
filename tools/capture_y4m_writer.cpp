// SPDX-License-Identifier: Apache-2.0
#include "tools/capture_y4m_writer.h"

#include "platform/bitmap_context.h"
#include "src/share_frame.h"
#include "src/share_image_save.h"
#include "src/share_ref.h"

#include <screenshare/share_convert.h>

#include <algorithm>
#include <cstddef>
#include <string_view>

namespace {

constexpr std::string_view FRAME_MARK = "FRAME\n";

std::size_t LumaBytes(TVLSize size) {
    return static_cast<std::size_t>(size.cx) * static_cast<std::size_t>(size.cy);
}

std::size_t ChromaBytes(TVLSize size) {
    return static_cast<std::size_t>((size.cx + 1) / 2) * static_cast<std::size_t>((size.cy + 1) / 2);
}

/// The chroma of each block sits in its middle, which such streams call "420jpeg" after the files that do so,
/// too; that name says nothing of the range, and readers that know ranges are told it apart.
std::string HeaderText(TVLSize size, unsigned fps) {
    return "YUV4MPEG2 W" + std::to_string(size.cx) + " H" + std::to_string(size.cy) + " F" +
           std::to_string(fps) + ":1 Ip A1:1 C420jpeg XYSCSS=420JPEG XCOLORRANGE=LIMITED\n";
}

/// In the middle, as large as it goes with its proportions.
platform::CGRect FittedRect(TVLSize size, TVLSize space) {
    const double scale =
        std::min(static_cast<double>(space.cx) / size.cx, static_cast<double>(space.cy) / size.cy);
    const double width = size.cx * scale;
    const double height = size.cy * scale;
    return {{static_cast<float>((space.cx - width) / 2), static_cast<float>((space.cy - height) / 2)},
            {static_cast<float>(width), static_cast<float>(height)}};
}

} // namespace

WriteResult Y4mWriter::Write(IShareFrame& frame) {
    TVLSize size{};
    frame.GetFrameSize(size);
    if (m_planes.empty()) {
        if (WriteResult failure = Begin(frame, size))
            return failure;
    } else {
        PassTimeTo(frame.GetTimestamp());
        if (WriteResult failure = RepeatUntilDue())
            return failure;
    }
    if (!Convert(frame, size))
        return WriteFailure{EXIT_CODE_FAILED, "a frame has a form that cannot be written"};
    // One that came before its turn is what is to be seen from the next turn on.
    return m_frames <= DueFrames() ? WritePicture() : std::nullopt;
}

WriteResult Y4mWriter::Finish(unsigned timestamp) {
    if (!m_planes.empty()) {
        PassTimeTo(timestamp);
        if (WriteResult failure = RepeatUntilDue())
            return failure;
    }
    return m_output.Close();
}

WriteResult Y4mWriter::Begin(IShareFrame& frame, TVLSize size) {
    m_size = size;
    m_timestamp = frame.GetTimestamp();
    m_planes.resize(LumaBytes(size) + 2 * ChromaBytes(size));
    const std::string header = HeaderText(size, m_form.fps);
    return m_output.Write(header.data(), header.size());
}

/// Timestamps are cut to 32 bits. One that seems to lie before the last is taken as the same moment.
void Y4mWriter::PassTimeTo(unsigned timestamp) {
    const unsigned passed = timestamp - m_timestamp;
    if (passed > 0x7FFFFFFFU)
        return;
    m_elapsedMs += passed;
    m_timestamp = timestamp;
}

/// How many frames of the stream lie before the present moment, rounded to the nearest: timestamps are whole
/// milliseconds and waver by a few.
std::int64_t Y4mWriter::DueFrames() const {
    return static_cast<std::int64_t>((m_elapsedMs * m_form.fps + 500) / 1000);
}

bool Y4mWriter::Convert(IShareFrame& frame, TVLSize size) {
    return size == m_size ? ConvertExactly(frame) : ConvertFitted(frame, size);
}

bool Y4mWriter::ConvertExactly(IShareFrame& frame) {
    std::uint8_t* const y = m_planes.data();
    std::uint8_t* const u = y + LumaBytes(m_size);
    std::uint8_t* const v = u + ChromaBytes(m_size);
    const int chromaWidth = (m_size.cx + 1) / 2;
    return ShareFrameToI420(&frame, y, m_size.cx, u, chromaWidth, v, chromaWidth, m_size.cx, m_size.cy) ==
           SHARE_RESULT_OK;
}

bool Y4mWriter::ConvertFitted(IShareFrame& frame, TVLSize size) {
    const ShareRef<CShareFrame> held(new CShareFrame);
    CShareFrame* const fitted = held.Get();
    fitted->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    fitted->SetFrameSize(m_size);
    const auto capacity = static_cast<std::size_t>(fitted->GetFrameDataLen());
    const platform::CGContextRef context =
        platform::CGBitmapContextCreate(fitted->GetFrameData(), capacity, m_size.cx, m_size.cy, 8,
                                        fitted->GetFrameLineBytes(), platform::kCGImageAlphaNoneSkipLast);
    const platform::CGImageRef image = ShareFrameToImage(&frame);
    if (context == nullptr || image == nullptr)
        return false;
    platform::CGContextSetInterpolationQuality(context.get(), platform::kCGInterpolationHigh);
    return platform::CGContextDrawImage(context.get(), FittedRect(size, m_size), image.get()) &&
           ConvertExactly(*fitted);
}

WriteResult Y4mWriter::RepeatUntilDue() {
    while (m_frames < DueFrames() && (m_form.frameLimit == 0 || m_frames < m_form.frameLimit)) {
        if (WriteResult failure = WritePicture())
            return failure;
    }
    return std::nullopt;
}

WriteResult Y4mWriter::WritePicture() {
    if (m_form.frameLimit != 0 && m_frames >= m_form.frameLimit)
        return std::nullopt;
    if (WriteResult failure = m_output.Write(FRAME_MARK.data(), FRAME_MARK.size()))
        return failure;
    if (WriteResult failure = m_output.Write(m_planes.data(), m_planes.size()))
        return failure;
    ++m_frames;
    return std::nullopt;
}
