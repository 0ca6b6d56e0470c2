// SPDX-License-Identifier: Apache-2.0
#include "util/cm_text_formator.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cstdint>

namespace {

// Room for the longest number: a sign and the 20 digits of 64 bits, or a float such as -1.17549e-38.
constexpr std::size_t NUMBER_SIZE = 24;

// std::to_chars prints as a fresh iostream does, without a locale's decimal comma and without allocating.
template <class Number, class... Format>
CCmTextFormator& PutNumber(CCmTextFormator& out, Number value, Format... format) {
    std::array<char, NUMBER_SIZE> digits;
    const auto end = std::to_chars(digits.data(), digits.data() + digits.size(), value, format...).ptr;
    return out << std::string_view(digits.data(), static_cast<std::size_t>(end - digits.data()));
}

} // namespace

CCmTextFormator::CCmTextFormator(char* buffer, std::size_t size) : m_buffer(buffer), m_size(size) {
    m_buffer[0] = '\0';
}

CCmTextFormator& CCmTextFormator::operator<<(std::string_view text) {
    const std::size_t room = m_size - 1 - m_length;
    m_length += text.copy(m_buffer + m_length, std::min(text.size(), room));
    m_buffer[m_length] = '\0';
    return *this;
}

CCmTextFormator& CCmTextFormator::operator<<(const char* text) {
    return text != nullptr ? *this << std::string_view(text) : *this;
}

CCmTextFormator& CCmTextFormator::operator<<(int value) {
    return PutNumber(*this, value);
}

CCmTextFormator& CCmTextFormator::operator<<(unsigned value) {
    return PutNumber(*this, value);
}

CCmTextFormator& CCmTextFormator::operator<<(long value) {
    return PutNumber(*this, value);
}

CCmTextFormator& CCmTextFormator::operator<<(unsigned long value) {
    return PutNumber(*this, value);
}

CCmTextFormator& CCmTextFormator::operator<<(long long value) {
    return PutNumber(*this, value);
}

CCmTextFormator& CCmTextFormator::operator<<(unsigned long long value) {
    return PutNumber(*this, value);
}

CCmTextFormator& CCmTextFormator::operator<<(float value) {
    return PutNumber(*this, value, std::chars_format::general, 6);
}

CCmTextFormator& CCmTextFormator::operator<<(const void* value) {
    return PutNumber(*this << "0x", reinterpret_cast<std::uintptr_t>(value), 16);
}
