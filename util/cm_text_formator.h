// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string_view>

/// Builds a line of text on a buffer of the caller. Text that doesn't fit is cut at size - 1 bytes; the
/// buffer is always terminated and never overrun. Allocates nothing, and doesn't look at the client's locale.
/// Numbers print in decimal, a bool as 0 or 1, a float with six significant digits, a pointer as 0x and
/// hexadecimal digits, a null text as nothing.
class CCmTextFormator {
public:
    static constexpr std::size_t BUFFER_SIZE = 1024;

    /// `size` is at least 1.
    CCmTextFormator(char* buffer, std::size_t size);

    CCmTextFormator& operator<<(const char* text);
    CCmTextFormator& operator<<(std::string_view text);
    CCmTextFormator& operator<<(int value);
    CCmTextFormator& operator<<(unsigned value);
    CCmTextFormator& operator<<(long value);
    CCmTextFormator& operator<<(unsigned long value);
    CCmTextFormator& operator<<(long long value);
    CCmTextFormator& operator<<(unsigned long long value);
    CCmTextFormator& operator<<(float value);
    CCmTextFormator& operator<<(const void* value);

    operator char*() { return m_buffer; }

    /// Bytes written, without the terminator.
    std::size_t tell() const { return m_length; }

private:
    char* m_buffer;
    std::size_t m_size;
    std::size_t m_length = 0;
};
