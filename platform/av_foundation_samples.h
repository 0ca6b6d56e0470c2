// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/core_types.h"

#include <cstddef>
#include <cstdint>
#include <memory>

/// Times, pixel buffers and sample buffers of a capture session.
///
/// Threads: any.
/// Errors:  null stands for a sample or a buffer that isn't there and gives 0, null or an error. Nothing
///          throws.
namespace platform {

// ---- Times

/// `value` / `timescale` seconds. Not valid, and no time at all, with a timescale below 1.
struct CMTime {
    std::int64_t value = 0;
    std::int32_t timescale = 0;

    bool operator==(const CMTime&) const = default;
};

CMTime CMTimeMake(std::int64_t value, std::int32_t timescale) noexcept;

/// To the nearest step of the timescale. Not valid for what is no finite number.
CMTime CMTimeMakeWithSeconds(double seconds, std::int32_t timescale) noexcept;

// ---- Pixel buffers

using CVReturn = std::int32_t;
constexpr CVReturn kCVReturnSuccess = 0;
constexpr CVReturn kCVReturnError = -6660;
constexpr CVReturn kCVReturnInvalidArgument = -6661;

/// How the 4 bytes of a pixel lie in memory.
enum CVPixelFormatType : std::uint32_t {
    kCVPixelFormatType_32ARGB = 32,         ///< Alpha, red, green, blue.
    kCVPixelFormatType_32RGBA = 0x52474241, ///< Red, green, blue, alpha.
};

enum CVPixelBufferLockFlags : unsigned {
    kCVPixelBufferLock_ReadOnly = 1,
};

/// One picture, the top row first. Nobody writes to it once it is in a sample.
/// Lifetime: shared. A session has few of them and gives no samples while all are held.
class CVPixelBuffer;
using CVPixelBufferRef = std::shared_ptr<CVPixelBuffer>;

/// Each successful lock is paid back by one unlock with the same flags.
CVReturn CVPixelBufferLockBaseAddress(CVPixelBuffer* buffer, unsigned flags) noexcept;
/// kCVReturnInvalidArgument for a buffer that isn't locked.
CVReturn CVPixelBufferUnlockBaseAddress(CVPixelBuffer* buffer, unsigned flags) noexcept;
/// Null while it isn't locked.
const std::uint8_t* CVPixelBufferGetBaseAddress(const CVPixelBuffer* buffer) noexcept;

/// Pixels.
std::size_t CVPixelBufferGetWidth(const CVPixelBuffer* buffer) noexcept;
std::size_t CVPixelBufferGetHeight(const CVPixelBuffer* buffer) noexcept;
/// Bytes from one row to the next.
std::size_t CVPixelBufferGetBytesPerRow(const CVPixelBuffer* buffer) noexcept;
std::uint32_t CVPixelBufferGetPixelFormatType(const CVPixelBuffer* buffer) noexcept;

// ---- Sample buffers

/// What a session gives out for one picture. Immutable.
struct CMSampleBuffer;
using CMSampleBufferRef = std::shared_ptr<const CMSampleBuffer>;

/// Null for a sample without a picture.
CVPixelBufferRef CMSampleBufferGetImageBuffer(const CMSampleBuffer* sample) noexcept;

/// Which stacks of windows a sample's pixels may show: that of the oldest one, and that after the picture was
/// fetched. Only when both are equal does the sample show that snapshot.
struct CMSampleBufferGenerations {
    std::uint64_t before = 0;
    std::uint64_t after = 0;

    bool operator==(const CMSampleBufferGenerations&) const = default;
};

CMSampleBufferGenerations CMSampleBufferGetGenerations(const CMSampleBuffer* sample) noexcept;

/// Of what the sample was made: the whole picture of its display, also where the input crops or scales it. In
/// global points; all zeros for null.
CGRect CMSampleBufferGetDisplayRect(const CMSampleBuffer* sample) noexcept;

// ---- For the session and for those who make samples themselves

/// Null for a size below 1, rows shorter than their pixels, no memory for the pixels, and without memory.
/// `pixels` holds `height` rows.
CVPixelBufferRef CVPixelBufferCreateWithBytes(std::size_t width, std::size_t height, std::uint32_t format,
                                              std::size_t bytesPerRow,
                                              std::shared_ptr<const std::uint8_t> pixels) noexcept;

/// Null without memory.
CMSampleBufferRef CMSampleBufferCreate(CVPixelBufferRef image, CMSampleBufferGenerations generations,
                                       const CGRect& displayRect = {}) noexcept;

} // namespace platform
