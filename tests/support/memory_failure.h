// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdlib>
#include <new>

/// Has a thread find no memory. It replaces the operators of the whole program, so include it in one file of
/// each.

namespace {

/// While set, this thread finds no memory.
thread_local bool isMemoryGone = false;
/// How many allocations of this thread still succeed before that is set. Below 0: all of them.
thread_local int allocationsLeft = -1;

void* Allocate(std::size_t size) noexcept {
    if (allocationsLeft >= 0 && allocationsLeft-- == 0)
        isMemoryGone = true;
    return isMemoryGone ? nullptr : std::malloc(size);
}

} // namespace

// Never inlined: next to an allocation that was not, the compiler would take them for a mismatch.
[[gnu::noinline]] void* operator new(std::size_t size) {
    if (void* const block = Allocate(size))
        return block;
    throw std::bad_alloc();
}
[[gnu::noinline]] void* operator new(std::size_t size, const std::nothrow_t&) noexcept {
    return Allocate(size);
}
[[gnu::noinline]] void operator delete(void* block) noexcept {
    std::free(block);
}
[[gnu::noinline]] void operator delete(void* block, std::size_t) noexcept {
    std::free(block);
}
[[gnu::noinline]] void operator delete(void* block, const std::nothrow_t&) noexcept {
    std::free(block);
}
