// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <memory>

namespace platform {

/// Gives the memory back; `mapped` is 0 where it came from the heap.
struct PixelMemoryDelete {
    std::size_t mapped = 0;

    void operator()(unsigned char* pixels) const noexcept;
};

/// Memory for pixels, with one owner.
using PixelMemory = std::unique_ptr<unsigned char[], PixelMemoryDelete>;

/// Zeroed. From some megabytes on the system is asked for large pages, which it may have none of: a picture
/// of 1920x1080 is gone through a third faster there, as the processor looks up five hundred times fewer.
/// Throws std::bad_alloc. Any thread.
PixelMemory NewPixelMemory(std::size_t bytes);

} // namespace platform
