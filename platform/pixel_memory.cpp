// SPDX-License-Identifier: Apache-2.0
#include "platform/pixel_memory.h"

#include <sys/mman.h>

#include <cstdint>
#include <new>

namespace platform {

namespace {

/// What most processors have besides their small pages.
constexpr std::size_t LARGE_PAGE = std::size_t{2} << 20U;
/// Of less, too little lies in large pages to be worth a mapping.
constexpr std::size_t BYTES_WORTH_MAPPING = 2 * LARGE_PAGE;
/// A multiple of the small pages that any Linux has.
constexpr std::size_t MAPPING_UNIT = std::size_t{64} << 10U;

std::size_t RoundUp(std::size_t bytes, std::size_t unit) {
    return (bytes + unit - 1) / unit * unit;
}

void Unmap(unsigned char* from, const unsigned char* to) {
    if (from != to)
        munmap(from, static_cast<std::size_t>(to - from));
}

/// Begins where a large page may. What was mapped to find such a place is given back.
unsigned char* MapAligned(std::size_t bytes) {
    void* const mapped =
        mmap(nullptr, bytes + LARGE_PAGE, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
    if (mapped == MAP_FAILED)
        throw std::bad_alloc();
    auto* const begin = static_cast<unsigned char*>(mapped);
    const std::size_t before = (0 - reinterpret_cast<std::uintptr_t>(begin)) % LARGE_PAGE;
    unsigned char* const pixels = begin + before;
    Unmap(begin, pixels);
    Unmap(pixels + bytes, begin + bytes + LARGE_PAGE);
    return pixels;
}

} // namespace

void PixelMemoryDelete::operator()(unsigned char* pixels) const noexcept {
    if (mapped != 0)
        munmap(pixels, mapped);
    else
        delete[] pixels;
}

PixelMemory NewPixelMemory(std::size_t bytes) {
    if (bytes < BYTES_WORTH_MAPPING)
        return PixelMemory(new unsigned char[bytes](), PixelMemoryDelete{});
    if (bytes > SIZE_MAX - 2 * LARGE_PAGE)
        throw std::bad_alloc();
    const std::size_t mapped = RoundUp(bytes, MAPPING_UNIT);
    PixelMemory pixels(MapAligned(mapped), PixelMemoryDelete{mapped});
    madvise(pixels.get(), mapped, MADV_HUGEPAGE); // a wish: without such pages it is memory all the same
    return pixels;
}

} // namespace platform
