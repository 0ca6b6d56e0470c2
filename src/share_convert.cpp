// SPDX-License-Identifier: Apache-2.0
#include "platform/yuv_planes.h"
#include "src/share_frame.h"
#include "util/cm_guarded_call.h"

#include <screenshare/share_convert.h>

#include <cstdint>
#include <optional>

namespace {

using platform::YuvPixelOrder;
using platform::YuvPlane;

std::optional<YuvPixelOrder> OrderOf(SHARE_FRAME_FORMAT format) {
    switch (format) {
        case SHARE_FRAME_FORMAT_RGBA:
            return YuvPixelOrder::RGBA;
        case SHARE_FRAME_FORMAT_ARGB:
            return YuvPixelOrder::ARGB;
        case SHARE_FRAME_FORMAT_RGB:
            return YuvPixelOrder::RGB;
        case SHARE_FRAME_FORMAT_BGRA:
            return YuvPixelOrder::BGRA;
        case SHARE_FRAME_FORMAT_ABGR:
            return YuvPixelOrder::ABGR;
        case SHARE_FRAME_FORMAT_BGR:
            return YuvPixelOrder::BGR;
        case SHARE_FRAME_FORMAT_NONE:
            break;
    }
    return std::nullopt;
}

std::int64_t RowBytesOf(YuvPixelOrder order, int width) {
    return std::int64_t{width} * (order == YuvPixelOrder::RGB || order == YuvPixelOrder::BGR ? 3 : 4);
}

/// Nothing for a frame that isn't a whole picture of that size.
std::optional<platform::YuvPicture> PictureOf(IShareFrame* frame, int width, int height) {
    if (frame == nullptr || width < 1 || height < 1)
        return std::nullopt;
    TVLSize size{};
    frame->GetFrameSize(size);
    const std::optional<YuvPixelOrder> order = OrderOf(frame->GetFrameDataFormat());
    const unsigned char* const pixels = frame->GetFrameData();
    if (size != TVLSize{width, height} || !order || pixels == nullptr)
        return std::nullopt;
    const std::int64_t stride = frame->GetFrameLineBytes();
    const std::int64_t rowBytes = RowBytesOf(*order, width);
    if (stride < rowBytes || stride * (height - 1) + rowBytes > CShareFrame::BackedDataLen(*frame))
        return std::nullopt;
    return platform::YuvPicture{pixels, static_cast<int>(stride), *order, width, height};
}

bool IsPlaneFor(const YuvPlane& plane, std::int64_t rowBytes) {
    return plane.samples != nullptr && plane.stride >= rowBytes;
}

std::int64_t BlocksOf(int width) {
    return (std::int64_t{width} + 1) / 2;
}

/// A client's own frame may throw.
template <class Convert>
int ConvertGuarded(const char* failure, Convert convert) {
    int result = SHARE_RESULT_FAILED;
    CmCallGuarded(failure, [&] { result = convert(); });
    return result;
}

} // namespace

// NOLINTBEGIN(readability-non-const-parameter): what is written to is written to elsewhere
int ShareFrameToI420(IShareFrame* frame, unsigned char* y, int yStride, unsigned char* u, int uStride,
                     unsigned char* v, int vStride, int width, int height) {
    return ConvertGuarded("[ShareFrameToI420]>>fail>>", [&] {
        const auto picture = PictureOf(frame, width, height);
        const YuvPlane yPlane{y, yStride};
        const YuvPlane uPlane{u, uStride};
        const YuvPlane vPlane{v, vStride};
        if (!picture || !IsPlaneFor(yPlane, width) || !IsPlaneFor(uPlane, BlocksOf(width)) ||
            !IsPlaneFor(vPlane, BlocksOf(width)))
            return SHARE_RESULT_INVALID_PARAM;
        platform::ConvertToI420(*picture, yPlane, uPlane, vPlane);
        return SHARE_RESULT_OK;
    });
}

int ShareFrameToNV12(IShareFrame* frame, unsigned char* y, int yStride, unsigned char* uv, int uvStride,
                     int width, int height) {
    return ConvertGuarded("[ShareFrameToNV12]>>fail>>", [&] {
        const auto picture = PictureOf(frame, width, height);
        const YuvPlane yPlane{y, yStride};
        const YuvPlane uvPlane{uv, uvStride};
        if (!picture || !IsPlaneFor(yPlane, width) || !IsPlaneFor(uvPlane, 2 * BlocksOf(width)))
            return SHARE_RESULT_INVALID_PARAM;
        platform::ConvertToNv12(*picture, yPlane, uvPlane);
        return SHARE_RESULT_OK;
    });
}
// NOLINTEND(readability-non-const-parameter)
