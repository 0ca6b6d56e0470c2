// SPDX-License-Identifier: Apache-2.0
#include "src/safe_memcpy.h"

#include <gtest/gtest.h>

#include <array>
#include <cstddef>
#include <string>
#include <vector>

// The checked copy: which check speaks first, what it leaves of the destination and who hears of it.

namespace {

/// What the handler was told; one handler for all, as it is a plain function.
struct Failure {
    std::string message;
    void* context;
    int error;
};

std::vector<Failure> g_failures;

// What was in force before any test.
const safe_lib_constraint_handler g_firstHandler = current_constraint_handler;
const safe_lib_constraint_handler g_firstFormerHandler = previous_constraint_handler;

void Remember(const char* message, void* context, int error) {
    g_failures.push_back({message, context, error});
}

void RememberElsewhere(const char* /*message*/, void* /*context*/, int /*error*/) {}

using Area = std::array<unsigned char, 16>;

constexpr Area BEFORE = {101, 102, 103, 104, 105, 106, 107, 108, 109, 110, 111, 112, 113, 114, 115, 116};

Area ClearedAt(std::size_t start, std::size_t length) {
    Area area = BEFORE;
    for (std::size_t i = start; i < start + length; ++i)
        area[i] = 0;
    return area;
}

class SafeMemcpy : public testing::Test {
protected:
    void SetUp() override {
        g_failures.clear();
        safe_lib_set_constraint_handler(Remember);
    }
    void TearDown() override { safe_lib_set_constraint_handler(nullptr); }

    /// One failure was told since the last look, and it was this one.
    static void ExpectTold(const char* message, int error) {
        ASSERT_EQ(g_failures.size(), 1u) << message;
        EXPECT_EQ(g_failures[0].message, message);
        EXPECT_EQ(g_failures[0].context, nullptr);
        EXPECT_EQ(g_failures[0].error, error);
        g_failures.clear();
    }

    Area m_dest = BEFORE;
    const Area m_src = {1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15, 16};
};

} // namespace

TEST_F(SafeMemcpy, CopiesAndLeavesWhatLiesBehind) {
    EXPECT_EQ(omnal_memcpy_s(m_dest.data(), 8, m_src.data(), 3), 0);
    Area expected = BEFORE;
    expected[0] = 1;
    expected[1] = 2;
    expected[2] = 3;
    EXPECT_EQ(m_dest, expected);
    EXPECT_TRUE(g_failures.empty());
}

TEST_F(SafeMemcpy, FillsTheDestinationToItsEnd) {
    EXPECT_EQ(omnal_memcpy_s(m_dest.data(), 16, m_src.data(), 16), 0);
    EXPECT_EQ(m_dest, m_src);
}

TEST_F(SafeMemcpy, RefusesANullDestination) {
    EXPECT_EQ(omnal_memcpy_s(nullptr, 8, m_src.data(), 4), 400);
    ExpectTold("memcpy_s: dest is NULL", 400);
}

TEST_F(SafeMemcpy, RefusesADestinationOfNoLength) {
    EXPECT_EQ(omnal_memcpy_s(m_dest.data(), 0, m_src.data(), 4), 401);
    ExpectTold("memcpy_s: dmax is 0", 401);
    EXPECT_EQ(m_dest, BEFORE);
}

TEST_F(SafeMemcpy, RefusesADestinationOfAnAbsurdLength) {
    for (const int dmax : {0x10000000, 0x7fffffff, -1, -0x7fffffff - 1}) {
        EXPECT_EQ(omnal_memcpy_s(m_dest.data(), dmax, m_src.data(), 4), 403) << dmax;
        ExpectTold("memcpy_s: dmax exceeds max", 403);
        EXPECT_EQ(m_dest, BEFORE);
    }
}

TEST_F(SafeMemcpy, AcceptsTheGreatestLength) {
    EXPECT_EQ(omnal_memcpy_s(m_dest.data(), 0x0fffffff, m_dest.data(), 4), 0);
    EXPECT_EQ(m_dest, BEFORE);
}

TEST_F(SafeMemcpy, RefusesASourceOfNoLength) {
    EXPECT_EQ(omnal_memcpy_s(m_dest.data(), 8, m_src.data(), 0), 401);
    ExpectTold("memcpy_s: smax is 0", 401);
    EXPECT_EQ(m_dest, ClearedAt(0, 8));
}

TEST_F(SafeMemcpy, RefusesASourceThatDoesNotFit) {
    for (const int smax : {9, 0x7fffffff, -1, -0x7fffffff - 1}) {
        m_dest = BEFORE;
        EXPECT_EQ(omnal_memcpy_s(m_dest.data(), 8, m_src.data(), smax), 403) << smax;
        ExpectTold("memcpy_s: smax exceeds dmax", 403);
        EXPECT_EQ(m_dest, ClearedAt(0, 8));
    }
}

TEST_F(SafeMemcpy, RefusesANullSource) {
    EXPECT_EQ(omnal_memcpy_s(m_dest.data(), 8, nullptr, 4), 400);
    ExpectTold("memcpy_s: src is NULL", 400);
    EXPECT_EQ(m_dest, ClearedAt(0, 8));
}

TEST_F(SafeMemcpy, RefusesASourceThatReachesIntoTheDestination) {
    EXPECT_EQ(omnal_memcpy_s(m_dest.data() + 1, 4, m_dest.data(), 2), 404);
    ExpectTold("memcpy_s: overlap undefined", 404);
    EXPECT_EQ(m_dest, ClearedAt(1, 4));
}

TEST_F(SafeMemcpy, CountsTheDestinationInFullWhereItLiesInFront) {
    EXPECT_EQ(omnal_memcpy_s(m_dest.data(), 8, m_dest.data() + 7, 1), 404);
    ExpectTold("memcpy_s: overlap undefined", 404);
    EXPECT_EQ(m_dest, ClearedAt(0, 8));
}

TEST_F(SafeMemcpy, SeesNoOverlapInNeighbours) {
    EXPECT_EQ(omnal_memcpy_s(m_dest.data(), 4, m_dest.data() + 4, 4), 0);
    EXPECT_EQ(m_dest[0], 105);
    EXPECT_EQ(m_dest[4], 105);
    // The source counts with its own length alone, though the destination would reach further.
    EXPECT_EQ(omnal_memcpy_s(m_dest.data() + 10, 6, m_dest.data() + 8, 2), 0);
    EXPECT_EQ(m_dest[10], 109);
    EXPECT_TRUE(g_failures.empty());
}

TEST_F(SafeMemcpy, TakesOneAreaOntoItselfForNoOverlap) {
    EXPECT_EQ(omnal_memcpy_s(m_dest.data(), 8, m_dest.data(), 8), 0);
    EXPECT_EQ(m_dest, BEFORE);
    EXPECT_TRUE(g_failures.empty());
}

TEST_F(SafeMemcpy, MakesItsChecksInOrder) {
    // Each call offends against its own check and against every one that can come after it.
    EXPECT_EQ(omnal_memcpy_s(nullptr, 0, nullptr, 0), 400);
    ExpectTold("memcpy_s: dest is NULL", 400);
    EXPECT_EQ(omnal_memcpy_s(m_dest.data(), 0, nullptr, 0), 401);
    ExpectTold("memcpy_s: dmax is 0", 401);
    EXPECT_EQ(omnal_memcpy_s(m_dest.data(), 0x10000000, nullptr, 0), 403);
    ExpectTold("memcpy_s: dmax exceeds max", 403);
    EXPECT_EQ(m_dest, BEFORE);
    EXPECT_EQ(omnal_memcpy_s(m_dest.data(), 4, nullptr, 0), 401);
    ExpectTold("memcpy_s: smax is 0", 401);
    EXPECT_EQ(omnal_memcpy_s(m_dest.data(), 4, nullptr, 5), 403);
    ExpectTold("memcpy_s: smax exceeds dmax", 403);
    EXPECT_EQ(omnal_memcpy_s(m_dest.data(), 4, m_dest.data() + 1, 5), 403);
    ExpectTold("memcpy_s: smax exceeds dmax", 403);
    EXPECT_EQ(omnal_memcpy_s(m_dest.data(), 4, nullptr, 4), 400);
    ExpectTold("memcpy_s: src is NULL", 400);
}

TEST(SafeLibHandler, IsTheDefaultOneAtFirst) {
    EXPECT_EQ(g_firstHandler, &safe_lib_default_constraint_handler);
    EXPECT_EQ(g_firstFormerHandler, &safe_lib_default_constraint_handler);
    safe_lib_set_constraint_handler(nullptr);
    EXPECT_EQ(omnal_memcpy_s(nullptr, 1, "x", 1), 400); // and nobody hears it
}

TEST(SafeLibHandler, GivesWayToAnotherAndIsRemembered) {
    safe_lib_set_constraint_handler(nullptr); // whatever another case has left
    EXPECT_EQ(safe_lib_set_constraint_handler(Remember), &safe_lib_default_constraint_handler);
    EXPECT_EQ(current_constraint_handler.load(), &Remember);
    EXPECT_EQ(previous_constraint_handler.load(), &safe_lib_default_constraint_handler);
    EXPECT_EQ(safe_lib_set_constraint_handler(RememberElsewhere), &Remember);
    EXPECT_EQ(previous_constraint_handler.load(), &Remember);
    EXPECT_EQ(current_constraint_handler.load(), &RememberElsewhere);
}

TEST(SafeLibHandler, IsTheDefaultOneAgainForNull) {
    safe_lib_set_constraint_handler(Remember);
    EXPECT_EQ(safe_lib_set_constraint_handler(nullptr), &Remember);
    EXPECT_EQ(current_constraint_handler.load(), &safe_lib_default_constraint_handler);
    EXPECT_EQ(previous_constraint_handler.load(), &Remember);
    g_failures.clear();
    EXPECT_EQ(omnal_memcpy_s(nullptr, 1, "x", 1), 400);
    EXPECT_TRUE(g_failures.empty());
}

TEST(SafeLibHandler, GetsWhatItIsInvokedWith) {
    safe_lib_set_constraint_handler(Remember);
    g_failures.clear();
    int context = 0;
    invoke_safe_lib_constraint_handler("text", &context, 7);
    ASSERT_EQ(g_failures.size(), 1u);
    EXPECT_EQ(g_failures[0].message, "text");
    EXPECT_EQ(g_failures[0].context, &context);
    EXPECT_EQ(g_failures[0].error, 7);
}

TEST(SafeLibHandler, MayBeNull) {
    current_constraint_handler = nullptr;
    invoke_safe_lib_constraint_handler("text", nullptr, 7);
    EXPECT_EQ(omnal_memcpy_s(nullptr, 1, "x", 1), 400);
    EXPECT_EQ(safe_lib_set_constraint_handler(Remember), nullptr);
    EXPECT_EQ(previous_constraint_handler.load(), nullptr);
}

TEST(SafeLibHandler, MayIgnoreEverything) {
    safe_lib_set_constraint_handler(safe_lib_ignore_handler);
    Area dest = BEFORE;
    EXPECT_EQ(omnal_memcpy_s(dest.data(), 8, nullptr, 8), 400);
    EXPECT_EQ(dest, ClearedAt(0, 8));
}
