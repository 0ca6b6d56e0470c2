// SPDX-License-Identifier: Apache-2.0
#include "platform/av_foundation_samples.h"

#include "platform/av_foundation_script.h"
#include "util/cm_numeric.h"

#include <atomic>
#include <cmath>
#include <new>
#include <utility>

namespace platform {

class CVPixelBuffer {
public:
    CVPixelBuffer(std::size_t itsWidth, std::size_t itsHeight, std::uint32_t itsFormat,
                  std::size_t itsBytesPerRow, std::shared_ptr<const std::uint8_t> itsPixels)
        : width(itsWidth),
          height(itsHeight),
          format(itsFormat),
          bytesPerRow(itsBytesPerRow),
          pixels(std::move(itsPixels)) {}

    const std::size_t width;
    const std::size_t height;
    const std::uint32_t format;
    const std::size_t bytesPerRow;
    const std::shared_ptr<const std::uint8_t> pixels;
    std::atomic<int> locks{0};
};

struct CMSampleBuffer {
    CVPixelBufferRef image;
    CMSampleBufferGenerations generations;
    CGRect displayRect;
};

namespace {

constexpr std::size_t PIXEL_BYTES = 4;

} // namespace

CMTime CMTimeMake(std::int64_t value, std::int32_t timescale) noexcept {
    return {value, timescale};
}

CMTime CMTimeMakeWithSeconds(double seconds, std::int32_t timescale) noexcept {
    if (!std::isfinite(seconds))
        return {};
    return {CmTruncate(std::floor(seconds * timescale + 0.5)), timescale};
}

CVReturn CVPixelBufferLockBaseAddress(CVPixelBuffer* buffer, unsigned) noexcept {
    if (buffer == nullptr)
        return kCVReturnInvalidArgument;
    if (AVCaptureScriptFails(AVCaptureOperation::LockBaseAddress))
        return kCVReturnError;
    ++buffer->locks;
    return kCVReturnSuccess;
}

CVReturn CVPixelBufferUnlockBaseAddress(CVPixelBuffer* buffer, unsigned) noexcept {
    if (buffer == nullptr)
        return kCVReturnInvalidArgument;
    int locks = buffer->locks.load();
    while (locks > 0) {
        if (buffer->locks.compare_exchange_weak(locks, locks - 1))
            return kCVReturnSuccess;
    }
    return kCVReturnInvalidArgument;
}

const std::uint8_t* CVPixelBufferGetBaseAddress(const CVPixelBuffer* buffer) noexcept {
    if (buffer == nullptr || buffer->locks.load() == 0)
        return nullptr;
    return AVCaptureScriptFails(AVCaptureOperation::GetBaseAddress) ? nullptr : buffer->pixels.get();
}

std::size_t CVPixelBufferGetWidth(const CVPixelBuffer* buffer) noexcept {
    return buffer != nullptr ? buffer->width : 0;
}

std::size_t CVPixelBufferGetHeight(const CVPixelBuffer* buffer) noexcept {
    return buffer != nullptr ? buffer->height : 0;
}

std::size_t CVPixelBufferGetBytesPerRow(const CVPixelBuffer* buffer) noexcept {
    if (buffer == nullptr)
        return 0;
    return AVCaptureScriptFails(AVCaptureOperation::GetBytesPerRow) ? (buffer->width - 1) * PIXEL_BYTES
                                                                    : buffer->bytesPerRow;
}

std::uint32_t CVPixelBufferGetPixelFormatType(const CVPixelBuffer* buffer) noexcept {
    return buffer != nullptr ? buffer->format : 0;
}

CVPixelBufferRef CMSampleBufferGetImageBuffer(const CMSampleBuffer* sample) noexcept {
    if (sample == nullptr || AVCaptureScriptFails(AVCaptureOperation::GetImageBuffer))
        return nullptr;
    return sample->image;
}

CMSampleBufferGenerations CMSampleBufferGetGenerations(const CMSampleBuffer* sample) noexcept {
    return sample != nullptr ? sample->generations : CMSampleBufferGenerations();
}

CGRect CMSampleBufferGetDisplayRect(const CMSampleBuffer* sample) noexcept {
    return sample != nullptr ? sample->displayRect : CGRect();
}

CVPixelBufferRef CVPixelBufferCreateWithBytes(std::size_t width, std::size_t height, std::uint32_t format,
                                              std::size_t bytesPerRow,
                                              std::shared_ptr<const std::uint8_t> pixels) noexcept {
    if (width < 1 || height < 1 || bytesPerRow / PIXEL_BYTES < width || pixels == nullptr)
        return nullptr;
    try {
        return std::make_shared<CVPixelBuffer>(width, height, format, bytesPerRow, std::move(pixels));
    } catch (const std::bad_alloc&) {
        return nullptr;
    }
}

CMSampleBufferRef CMSampleBufferCreate(CVPixelBufferRef image, CMSampleBufferGenerations generations,
                                       const CGRect& displayRect) noexcept {
    try {
        return std::make_shared<const CMSampleBuffer>(
            CMSampleBuffer{std::move(image), generations, displayRect});
    } catch (const std::bad_alloc&) {
        return nullptr;
    }
}

} // namespace platform
