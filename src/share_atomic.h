// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/core_types.h"

#include <screenshare/share_types.h>

#include <atomic>
#include <bit>
#include <cstdint>

/// Plain values that one thread writes and another reads without a lock. Each read gives some value that was
/// written; there is no order between different ones.

template <class T>
class ShareRelaxed {
public:
    constexpr explicit ShareRelaxed(T value = T()) : m_value(value) {}
    operator T() const {
        return m_value.load(std::memory_order_relaxed);
    } // NOLINT(google-explicit-constructor)
    ShareRelaxed& operator=(T value) {
        m_value.store(value, std::memory_order_relaxed);
        return *this;
    }

private:
    std::atomic<T> m_value;
};

/// A size that is never seen half written.
class ShareRelaxedSize {
public:
    operator TVLSize() const { // NOLINT(google-explicit-constructor)
        return std::bit_cast<TVLSize>(m_value.load(std::memory_order_relaxed));
    }
    ShareRelaxedSize& operator=(TVLSize size) {
        m_value.store(std::bit_cast<std::uint64_t>(size), std::memory_order_relaxed);
        return *this;
    }

private:
    std::atomic<std::uint64_t> m_value{0};
};

/// A rectangle whose edges may be of neighbouring writes.
class ShareRelaxedRect {
public:
    operator TVLRect() const { // NOLINT(google-explicit-constructor)
        return TVLRect{m_left, m_top, m_right, m_bottom};
    }
    ShareRelaxedRect& operator=(const TVLRect& rect) {
        m_left = rect.left;
        m_top = rect.top;
        m_right = rect.right;
        m_bottom = rect.bottom;
        return *this;
    }

private:
    ShareRelaxed<int> m_left;
    ShareRelaxed<int> m_top;
    ShareRelaxed<int> m_right;
    ShareRelaxed<int> m_bottom;
};

/// A rectangle of the desktop whose parts may be of neighbouring writes.
class ShareRelaxedCGRect {
public:
    operator platform::CGRect() const { // NOLINT(google-explicit-constructor)
        return {{m_x, m_y}, {m_width, m_height}};
    }
    ShareRelaxedCGRect& operator=(const platform::CGRect& rect) {
        m_x = rect.origin.x;
        m_y = rect.origin.y;
        m_width = rect.size.width;
        m_height = rect.size.height;
        return *this;
    }

private:
    ShareRelaxed<float> m_x;
    ShareRelaxed<float> m_y;
    ShareRelaxed<float> m_width;
    ShareRelaxed<float> m_height;
};
