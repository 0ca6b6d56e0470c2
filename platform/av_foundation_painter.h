// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/av_foundation_samples.h"
#include "platform/core_types.h"
#include "platform/window_server.h"

#include <cstddef>
#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>
#include <vector>

/// How a session makes the pixels of a sample from the picture of a display.
namespace platform {

/// What of a picture a sample shows, and in which size.
struct SampleGeometry {
    PixelRect part;   ///< Of the picture.
    double scale = 1; ///< The sample's pixels per pixel of the picture.
    int width = 0;    ///< Of the sample.
    int height = 0;
};

/// `crop` is in points from the display's top left; without an area it is the whole display. Nothing when
/// none of it lies on the display.
std::optional<SampleGeometry> GeometryOfSample(const Picture& picture, const CGRect& crop, CGFloat scale);

/// Whether what has changed of a picture shows in a sample.
bool ShowsChange(const Picture& picture, const PixelRect& part);

/// The pointer on a sample. Its place is in the sample's pixels, from the bottom left.
struct PointerOnSample {
    std::shared_ptr<const CursorImage> cursor; ///< Keeps `picture`.
    const Picture* picture = nullptr;
    CGRect place;

    bool operator==(const PointerOnSample&) const = default;
};

/// Nothing when the pointer isn't known, or not where the sample shows it.
std::optional<PointerOnSample> FindPointer(WindowServer& server, const Picture& picture,
                                           const SampleGeometry& geometry);

/// Fills `target`, which has room for rows without gaps, with pixels of that CVPixelFormatType. False without
/// memory; then anything may be in it.
bool PaintSample(const std::shared_ptr<const Picture>& picture, const SampleGeometry& geometry,
                 const std::optional<PointerOnSample>& pointer, std::uint32_t format, std::uint8_t* target);

/// The pixel memory of a session's samples: a few blocks that are used again when nobody holds them any more.
/// Lifetime: a block keeps the pool. Threads: any.
class SampleBufferPool : public std::enable_shared_from_this<SampleBufferPool> {
public:
    /// One is painted, one waits, one is with the delegate, a client keeps two and reads one, and the last
    /// one is kept by the session.
    static constexpr int BLOCKS = 7;

    SampleBufferPool() { m_idle.reserve(BLOCKS); }

    bool HasBlock() const;
    /// Null while all are in use. Throws std::bad_alloc. Old content is in it.
    std::shared_ptr<std::uint8_t> Take(std::size_t size);

private:
    using Block = std::unique_ptr<std::uint8_t[]>;

    Block Withdraw(std::size_t size);
    void GiveBack(Block block, std::size_t size);

    mutable std::mutex m_mutex;
    // Guarded by m_mutex.
    int m_inUse = 0;
    std::size_t m_size = 0; // of the idle ones
    std::vector<Block> m_idle;
};

} // namespace platform
