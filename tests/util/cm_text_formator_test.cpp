// SPDX-License-Identifier: Apache-2.0
#include "util/cm_text_formator.h"

#include "tests/support/test_effort.h"

#include <gtest/gtest.h>

#include <array>
#include <climits>
#include <cstdint>
#include <cstring>
#include <iostream>
#include <limits>
#include <locale>
#include <random>
#include <sstream>
#include <string>

namespace {

template <class... Parts>
std::string Format(const Parts&... parts) {
    char buffer[CCmTextFormator::BUFFER_SIZE];
    CCmTextFormator out(buffer, sizeof buffer);
    (out << ... << parts);
    EXPECT_EQ(std::strlen(buffer), out.tell());
    EXPECT_EQ(static_cast<char*>(out), buffer);
    return buffer;
}

/// A buffer with a guard behind it that must stay as it is.
struct GuardedBuffer {
    static constexpr char GUARD = '#';

    explicit GuardedBuffer(std::size_t size)
        : bytes(size + 16, GUARD),
          out(bytes.data(), size),
          m_size(size) {}

    std::string Text() const { return bytes.c_str(); }
    bool GuardIsWhole() const { return bytes.substr(m_size) == std::string(16, GUARD); }

    std::string bytes;
    CCmTextFormator out;

private:
    std::size_t m_size;
};

std::string AsIostreamPrints(float value) {
    std::ostringstream out;
    out.imbue(std::locale::classic());
    out << value;
    return out.str();
}

} // namespace

TEST(CmTextFormator, StartsEmptyAndTerminated) {
    GuardedBuffer buffer(8);
    EXPECT_EQ(buffer.Text(), "");
    EXPECT_EQ(buffer.out.tell(), 0u);
}

TEST(CmTextFormator, PutsPartsTogetherWithoutBlanks) {
    const bool on = true;
    const char word[] = "w=";
    EXPECT_EQ(Format(word, 640, ",h=", 480u, ",on=", on, ",off=", false), "w=640,h=480,on=1,off=0");
    EXPECT_EQ(Format(std::string("a"), std::string_view("bcd", 2)), "abc");
}

TEST(CmTextFormator, PrintsIntegersInDecimalUpToTheirLimits) {
    EXPECT_EQ(Format(0, ",", INT_MIN, ",", INT_MAX), "0,-2147483648,2147483647");
    EXPECT_EQ(Format(UINT_MAX), "4294967295");
    EXPECT_EQ(Format(LONG_MIN, ",", LONG_MAX, ",", ULONG_MAX),
              "-9223372036854775808,9223372036854775807,18446744073709551615");
    EXPECT_EQ(Format(LLONG_MIN, ",", LLONG_MAX, ",", ULLONG_MAX),
              "-9223372036854775808,9223372036854775807,18446744073709551615");
}

TEST(CmTextFormator, PrintsANullTextAsNothing) {
    const char* const none = nullptr;
    EXPECT_EQ(Format("[", none, "]"), "[]");
}

TEST(CmTextFormator, PrintsPointersInHexadecimal) {
    EXPECT_EQ(Format(reinterpret_cast<const void*>(std::uintptr_t{0xDEADBEEF0u})), "0xdeadbeef0");
    EXPECT_EQ(Format(reinterpret_cast<const void*>(UINTPTR_MAX)), "0xffffffffffffffff");
    EXPECT_EQ(Format(static_cast<const void*>(nullptr)), "0x0");
    const int object = 0;
    EXPECT_EQ(Format(&object).rfind("0x", 0), 0u);
}

TEST(CmTextFormator, PrintsFloatsWithSixSignificantDigits) {
    using Limits = std::numeric_limits<float>;
    EXPECT_EQ(Format(0.1f), "0.1");
    EXPECT_EQ(Format(1.0f), "1");
    EXPECT_EQ(Format(-0.0f), "-0");
    EXPECT_EQ(Format(1e5f), "100000");
    EXPECT_EQ(Format(1e6f), "1e+06");
    EXPECT_EQ(Format(123456.7f), "123457");
    EXPECT_EQ(Format(0.0001f), "0.0001");
    EXPECT_EQ(Format(0.00001f), "1e-05");
    EXPECT_EQ(Format(1.0f / 3.0f), "0.333333");
    EXPECT_EQ(Format(Limits::max(), ",", -Limits::min()), "3.40282e+38,-1.17549e-38");
    EXPECT_EQ(Format(Limits::infinity(), ",", -Limits::infinity()), "inf,-inf");
    EXPECT_EQ(Format(Limits::quiet_NaN()), "nan");
}

TEST(CmTextFormator, PrintsAnyFloatAsAnIostreamWould) {
    constexpr unsigned SEED = 20140113;
    const int count = 100000 * TestEffort();
    std::cout << "floats: " << count << ", seed: " << SEED << "\n";
    std::mt19937 random(SEED);
    for (int i = 0; i < count; ++i) {
        const auto bits = static_cast<std::uint32_t>(random());
        float value;
        std::memcpy(&value, &bits, sizeof value);
        ASSERT_EQ(Format(value), AsIostreamPrints(value)) << "bits " << bits;
    }
}

TEST(CmTextFormator, CutsWhatDoesNotFit) {
    GuardedBuffer buffer(8);
    buffer.out << "abcde" << 12345 << "more" << 0.5f;
    EXPECT_EQ(buffer.Text(), "abcde12");
    EXPECT_EQ(buffer.out.tell(), 7u);
    EXPECT_TRUE(buffer.GuardIsWhole());
}

TEST(CmTextFormator, FillsTheBufferToTheLastByteButOne) {
    GuardedBuffer buffer(8);
    buffer.out << "abcdefg";
    EXPECT_EQ(buffer.Text(), "abcdefg");
    buffer.out << "h";
    EXPECT_EQ(buffer.Text(), "abcdefg");
    EXPECT_TRUE(buffer.GuardIsWhole());
}

TEST(CmTextFormator, KeepsAnOverlongLineAt1023Bytes) {
    GuardedBuffer buffer(CCmTextFormator::BUFFER_SIZE);
    for (int i = 0; i < 300; ++i)
        buffer.out << "0123456789";
    EXPECT_EQ(buffer.out.tell(), 1023u);
    EXPECT_EQ(buffer.Text().size(), 1023u);
    EXPECT_EQ(buffer.Text().substr(1020), "012");
    EXPECT_TRUE(buffer.GuardIsWhole());
}

TEST(CmTextFormator, WritesNothingButTheTerminatorIntoOneByte) {
    GuardedBuffer buffer(1);
    buffer.out << "text" << 1 << 1.0f;
    EXPECT_EQ(buffer.Text(), "");
    EXPECT_EQ(buffer.out.tell(), 0u);
    EXPECT_TRUE(buffer.GuardIsWhole());
}
