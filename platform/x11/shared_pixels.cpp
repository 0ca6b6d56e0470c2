// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/shared_pixels.h"

#include "platform/fork_watch.h"
#include "platform/x11/pixels_file.h"
#include "platform/x11/x11_failure.h"
#include "util/cm_clock.h"

#include <xcb/shm.h>
#include <xcb/xcb.h>

#include <sys/mman.h>
#include <algorithm>
#include <bit>
#include <cstring>
#include <limits>
#include <mutex>
#include <new>
#include <utility>
#include <vector>

namespace platform::x11 {

namespace {

using Nanoseconds = std::chrono::nanoseconds;

constexpr std::size_t SMALLEST_BLOCK = std::size_t{64} << 10U;
constexpr std::size_t LARGEST_BLOCK = std::size_t{1} << 30U;
/// A block may be used for something that is smaller by this factor.
constexpr std::size_t MOST_WASTE = 2;
constexpr std::uint32_t ALL_PLANES = ~std::uint32_t{0};

/// An eighth of the power of two below is wasted at most, and little of that is ever touched.
std::size_t SizeClassOf(std::size_t bytes) {
    if (bytes <= SMALLEST_BLOCK)
        return SMALLEST_BLOCK;
    const std::size_t step = std::bit_floor(bytes | SMALLEST_BLOCK) / 8;
    return (bytes + step - 1) / step * step;
}

} // namespace

class SharedPixelsPool::Block final : public SharedPixels {
public:
    Block(void* bytes, std::size_t size) : m_bytes(static_cast<std::uint8_t*>(bytes)), m_size(size) {}
    ~Block() override { munmap(m_bytes, m_size); }
    Block(const Block&) = delete;
    Block& operator=(const Block&) = delete;

    std::uint8_t* Bytes() const override { return m_bytes; }
    std::size_t Size() const override { return m_size; }
    std::uint32_t Segment() const override { return m_segment; }
    void SetSegment(std::uint32_t segment) { m_segment = segment; }
    bool IsReusable() const { return !IsBeingWritten(); }

    Nanoseconds idleSince{0};

private:
    std::uint8_t* const m_bytes;
    const std::size_t m_size;
    std::uint32_t m_segment = 0;
};

/// What the pool shares with the blocks that are out.
struct SharedPixelsPool::Store {
    void TakeBack(std::unique_ptr<Block> block);
    std::unique_ptr<Block> TakeIdle(std::size_t bytes);

    void MakeRoomForOneMore();
    void Doom(const Block& block);

    const ForkWatch forks;
    std::mutex mutex;
    // Guarded by the mutex from here on.
    std::vector<std::unique_ptr<Block>> idle; // the one that has lain longest first
    std::size_t idleBytes = 0;
    std::size_t blocks = 0; // idle or out
    std::vector<std::uint32_t> attached;
    std::vector<std::uint32_t> doomed; // segments to be detached
    bool ended = false;
};

void SharedPixelsPool::Store::TakeBack(std::unique_ptr<Block> block) {
    // In a child the lock may be held by a thread that isn't there.
    if (forks.InChild())
        return;
    const std::lock_guard lock(mutex);
    if (ended)
        return;
    if (block->IsReusable() && idleBytes + block->Size() <= IDLE_LIMIT) {
        block->idleSince = CmSteadyNow();
        idleBytes += block->Size();
        idle.push_back(std::move(block));
    } else {
        Doom(*block);
    }
}

/// Nothing is allocated when a block comes back, since that must not fail.
void SharedPixelsPool::Store::MakeRoomForOneMore() {
    idle.reserve(blocks + 1);
    doomed.reserve(doomed.size() + blocks + 1);
    ++blocks;
}

void SharedPixelsPool::Store::Doom(const Block& block) {
    --blocks;
    if (block.Segment() != 0)
        doomed.push_back(block.Segment());
}

std::unique_ptr<SharedPixelsPool::Block> SharedPixelsPool::Store::TakeIdle(std::size_t bytes) {
    const std::lock_guard lock(mutex);
    auto best = idle.end();
    for (auto block = idle.begin(); block != idle.end(); ++block) {
        const std::size_t size = (*block)->Size();
        if (size < bytes || size / MOST_WASTE > bytes)
            continue;
        if (best == idle.end() || size <= (*best)->Size())
            best = block;
    }
    if (best == idle.end())
        return nullptr;
    std::unique_ptr<Block> found = std::move(*best);
    idle.erase(best);
    idleBytes -= found->Size();
    return found;
}

SharedPixelsPool::SharedPixelsPool(X11Connection& connection)
    : m_connection(connection),
      m_store(std::make_shared<Store>()),
      m_refused(!connection.Has().shm) {}

SharedPixelsPool::~SharedPixelsPool() {
    if (m_store->forks.InChild())
        return;
    const std::lock_guard lock(m_store->mutex);
    m_store->ended = true;
    m_store->idle.clear();
    // The server keeps its own mapping; pictures that are held keep ours.
    for (const std::uint32_t segment : m_store->attached)
        xcb_shm_detach(m_connection.Get(), segment);
    for (const std::uint32_t segment : m_store->doomed)
        xcb_shm_detach(m_connection.Get(), segment);
    xcb_flush(m_connection.Get());
}

std::shared_ptr<SharedPixels> SharedPixelsPool::Take(std::size_t bytes) {
    DetachDoomed();
    if (bytes > LARGEST_BLOCK)
        return nullptr;
    const std::size_t size = SizeClassOf(bytes);
    std::unique_ptr<Block> block = m_store->TakeIdle(size);
    if (block == nullptr)
        block = Make(size);
    if (block == nullptr)
        return nullptr;
    return {block.release(),
            [store = m_store](Block* dropped) { store->TakeBack(std::unique_ptr<Block>(dropped)); }};
}

std::unique_ptr<SharedPixelsPool::Block> SharedPixelsPool::Make(std::size_t bytes) {
    OwnedDescriptor file = OpenPixelsFile(bytes);
    if (!file)
        return nullptr;
    void* const mapped = mmap(nullptr, bytes, PROT_READ | PROT_WRITE, MAP_SHARED, file.Get(), 0);
    if (mapped == MAP_FAILED)
        return nullptr;
    auto block = std::make_unique<Block>(mapped, bytes);
    if (!m_refused) {
        const std::uint32_t segment = m_connection.NewId();
        m_refused = !Attach(segment, file.Release());
        block->SetSegment(m_refused ? 0 : segment);
    }
    const std::lock_guard lock(m_store->mutex);
    m_store->MakeRoomForOneMore();
    if (block->Segment() != 0)
        m_store->attached.push_back(block->Segment());
    return block;
}

/// False when the server refuses. The connection closes the descriptor when it has sent it.
bool SharedPixelsPool::Attach(std::uint32_t segment, int descriptor) {
    xcb_connection_t* const connection = m_connection.Get();
    Pending<void> attaching =
        m_connection.Ask<void>(xcb_shm_attach_fd_checked(connection, segment, descriptor, 0));
    try {
        m_connection.RoundTrip();
    } catch (const Unanswered&) {
        const std::lock_guard lock(m_store->mutex);
        m_store->doomed.push_back(segment);
        throw;
    }
    // All that was asked so far is done, so this doesn't wait.
    const Malloced<xcb_generic_error_t> refusal(xcb_request_check(connection, {attaching.Take()}));
    m_connection.Check();
    return refusal == nullptr;
}

std::optional<std::chrono::nanoseconds> SharedPixelsPool::OldestIdle() const {
    const std::lock_guard lock(m_store->mutex);
    if (m_store->idle.empty())
        return std::nullopt;
    return m_store->idle.front()->idleSince;
}

void SharedPixelsPool::Drop(Nanoseconds before) {
    {
        const std::lock_guard lock(m_store->mutex);
        auto& idle = m_store->idle;
        const auto old = [before](const std::unique_ptr<Block>& block) { return block->idleSince <= before; };
        for (const std::unique_ptr<Block>& block : idle) {
            if (!old(block))
                continue;
            m_store->idleBytes -= block->Size();
            m_store->Doom(*block);
        }
        idle.erase(std::remove_if(idle.begin(), idle.end(), old), idle.end());
    }
    DetachDoomed();
}

void SharedPixelsPool::DetachDoomed() {
    const std::lock_guard lock(m_store->mutex);
    for (const std::uint32_t segment : m_store->doomed) {
        xcb_shm_detach(m_connection.Get(), segment);
        std::erase(m_store->attached, segment);
    }
    m_store->doomed.clear();
}

RowsRead RowsRead::Ask(X11Connection& connection, xcb_drawable_t drawable, int left, int top, int width,
                       int bottom, SharedPixels& pixels, std::size_t offset, std::size_t bytesPerPixel) {
    const std::size_t rowBytes = (static_cast<std::size_t>(width) * bytesPerPixel + 3) & ~std::size_t{3};
    RowsRead read;
    read.m_pixels = &pixels;
    read.m_offset = offset;
    read.m_bytes = rowBytes * static_cast<std::size_t>(bottom - top);
    const auto x = static_cast<std::int16_t>(left);
    const auto y = static_cast<std::int16_t>(top);
    const auto columns = static_cast<std::uint16_t>(width);
    const auto rows = static_cast<std::uint16_t>(bottom - top);
    // A server that was asked to write behind the end would refuse; through the socket it is on us.
    if (offset > pixels.Size() || read.m_bytes > pixels.Size() - offset)
        return RowsRead();
    ++pixels.m_readsOnTheirWay;
    if (pixels.Segment() != 0) {
        read.m_reply = connection.Ask<void>(xcb_shm_get_image(
            connection.Get(), drawable, x, y, columns, rows, ALL_PLANES, XCB_IMAGE_FORMAT_Z_PIXMAP,
            pixels.Segment(), static_cast<std::uint32_t>(offset)));
    } else {
        read.m_reply = connection.Ask<void>(xcb_get_image(connection.Get(), XCB_IMAGE_FORMAT_Z_PIXMAP,
                                                          drawable, x, y, columns, rows, ALL_PLANES));
    }
    return read;
}

bool RowsRead::Finish(X11Connection& connection) {
    if (m_pixels == nullptr)
        return false;
    const Malloced<void> reply = connection.Await(m_reply);
    --m_pixels->m_readsOnTheirWay;
    if (reply == nullptr)
        return false;
    if (m_pixels->Segment() != 0)
        return static_cast<const xcb_shm_get_image_reply_t*>(reply.get())->size == m_bytes;
    const auto* const image = static_cast<const xcb_get_image_reply_t*>(reply.get());
    if (std::size_t{image->length} * 4 < m_bytes)
        return false;
    std::memcpy(m_pixels->Bytes() + m_offset, xcb_get_image_data(image), m_bytes);
    return true;
}

} // namespace platform::x11
