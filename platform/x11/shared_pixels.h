// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/x11/x11_connection.h"

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>

namespace platform::x11 {

/// Memory that the X server writes pictures into. Nobody else can open it: an anonymous file, sealed against
/// shrinking, else one that only its owner may open and that has no name any more.
/// Threads: any may read it and drop it; the X thread has the server write.
class SharedPixels {
public:
    virtual ~SharedPixels() = default;
    virtual std::uint8_t* Bytes() const = 0;
    virtual std::size_t Size() const = 0;
    /// The server's name for it; 0 when it refuses shared memory, and pictures come through the socket.
    virtual std::uint32_t Segment() const = 0;

protected:
    /// Somebody has stopped waiting for a read: the server may still write here.
    bool IsBeingWritten() const { return m_readsOnTheirWay != 0; }

private:
    friend class RowsRead;
    unsigned m_readsOnTheirWay = 0;
};

/// Makes and reuses such memory. What it holds was written before: whoever takes it writes all that he shows.
/// Threads: the X thread; what it gives out may be dropped anywhere, also after the pool and the connection.
class SharedPixelsPool {
public:
    /// Memory that nobody uses is kept up to so many bytes.
    static constexpr std::size_t IDLE_LIMIT = std::size_t{64} << 20U;

    explicit SharedPixelsPool(X11Connection& connection);
    ~SharedPixelsPool();
    SharedPixelsPool(const SharedPixelsPool&) = delete;
    SharedPixelsPool& operator=(const SharedPixelsPool&) = delete;

    /// At least so many bytes. Null when there is no memory.
    std::shared_ptr<SharedPixels> Take(std::size_t bytes);
    /// Since when the oldest of what nobody uses has lain idle.
    std::optional<std::chrono::nanoseconds> OldestIdle() const;
    /// Lets go of memory that has lain idle since `before`.
    void Drop(std::chrono::nanoseconds before);

private:
    class Block;
    struct Store;

    std::unique_ptr<Block> Make(std::size_t bytes);
    bool Attach(std::uint32_t segment, int descriptor);
    void DetachDoomed();

    X11Connection& m_connection;
    const std::shared_ptr<Store> m_store;
    bool m_refused;
};

/// True when `share` is the only one. What those who had the others have read is then over, so that it may be
/// written to.
template <class T>
bool IsOnlyShare(const std::shared_ptr<T>& share) {
    if (share.use_count() != 1)
        return false;
    // The count is read without order. To give a share back is ordered after whoever gave one back before.
    std::shared_ptr<T>(share).reset();
    return true;
}

/// A read of a drawable's rows into shared memory that is on its way.
class RowsRead {
public:
    RowsRead() = default;

    /// Asks for rows [top, bottom) of a drawable that is `width` pixels wide from `left`, in the server's
    /// order, to be put at `offset` of `pixels`, without gaps. A pixel has 4 bytes, or 2 where the depth is
    /// below 17; rows of the latter end at a multiple of 4 bytes. All four numbers fit 16 bits.
    static RowsRead Ask(X11Connection& connection, xcb_drawable_t drawable, int left, int top, int width,
                        int bottom, SharedPixels& pixels, std::size_t offset, std::size_t bytesPerPixel = 4);
    /// False when the server has refused, as when the drawable is gone.
    bool Finish(X11Connection& connection);

private:
    Pending<void> m_reply{};
    SharedPixels* m_pixels = nullptr;
    std::size_t m_offset = 0;
    std::size_t m_bytes = 0;
};

} // namespace platform::x11
