// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <span>

/// What a fuzzer makes its choices from. At its end there are zeros.
class Input {
public:
    Input(const std::uint8_t* data, std::size_t size) : m_rest(data, size) {}

    std::uint8_t Byte() {
        if (m_rest.empty())
            return 0;
        const std::uint8_t byte = m_rest.front();
        m_rest = m_rest.subspan(1);
        return byte;
    }
    std::uint32_t Word() {
        std::uint32_t word = 0;
        for (unsigned shift = 0; shift < 32; shift += 8)
            word |= std::uint32_t{Byte()} << shift;
        return word;
    }
    /// Fewer where there are no more.
    std::span<const std::uint8_t> Bytes(std::size_t count) {
        const std::span<const std::uint8_t> bytes = m_rest.first(std::min(count, m_rest.size()));
        m_rest = m_rest.subspan(bytes.size());
        return bytes;
    }
    bool IsEmpty() const { return m_rest.empty(); }

private:
    std::span<const std::uint8_t> m_rest;
};
