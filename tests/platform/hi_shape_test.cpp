// SPDX-License-Identifier: Apache-2.0
#include "platform/hi_shape.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <cstdlib>
#include <limits>
#include <ostream>
#include <string>
#include <vector>

#if defined(__has_feature)
#define TEST_HAS_FEATURE(feature) __has_feature(feature)
#else
#define TEST_HAS_FEATURE(feature) 0
#endif

// Sanitizers bring an allocator of their own, which must not be replaced.
#if defined(__GLIBC__) && !defined(__SANITIZE_ADDRESS__) && !defined(__SANITIZE_THREAD__) && \
    !TEST_HAS_FEATURE(address_sanitizer) && !TEST_HAS_FEATURE(thread_sanitizer)
#define TEST_REPLACES_MALLOC 1
#else
#define TEST_REPLACES_MALLOC 0
#endif

namespace {

/// How many allocations of this thread still succeed; negative: all.
thread_local int allocationsLeft = -1;

#if TEST_REPLACES_MALLOC
bool IsAllocationRefused() {
    if (allocationsLeft < 0)
        return false;
    if (allocationsLeft == 0)
        return true;
    --allocationsLeft;
    return false;
}
#endif

} // namespace

#if TEST_REPLACES_MALLOC
extern "C" {
void* __libc_malloc(std::size_t size);
void* __libc_realloc(void* block, std::size_t size);

__attribute__((visibility("default"))) void* malloc(std::size_t size) noexcept {
    return IsAllocationRefused() ? nullptr : __libc_malloc(size);
}

__attribute__((visibility("default"))) void* realloc(void* block, std::size_t size) noexcept {
    return IsAllocationRefused() ? nullptr : __libc_realloc(block, size);
}
}
#endif

namespace platform {

void PrintTo(const CGRect& rect, std::ostream* out) {
    *out << "{" << rect.origin.x << "," << rect.origin.y << " " << rect.size.width << "x" << rect.size.height
         << "}";
}

namespace {

using Rects = std::vector<CGRect>;

constexpr float kNaN = std::numeric_limits<float>::quiet_NaN();
constexpr float kInfinity = std::numeric_limits<float>::infinity();
constexpr CGRect kTouched{{1, 2}, {3, 4}};

HIMutableShapeRef Shape(const Rects& rects) {
    HIMutableShapeRef shape = HIShapeCreateMutable();
    for (const CGRect& rect : rects)
        EXPECT_EQ(HIShapeUnionWithRect(shape.get(), rect), noErr);
    return shape;
}

OSStatus AppendRect(HIShapeEnumerateMessage message, const HIShape*, const CGRect* rect, void* rects) {
    if (message == kHIShapeEnumerateRect)
        static_cast<Rects*>(rects)->push_back(*rect);
    return noErr;
}

Rects RectsOf(const HIShape* shape) {
    Rects rects;
    EXPECT_EQ(HIShapeEnumerate(shape, kHIShapeParseFromTopLeft, AppendRect, &rects), noErr);
    return rects;
}

Rects RectsOf(const HIMutableShapeRef& shape) {
    return RectsOf(shape.get());
}

/// Notes what an enumeration tells and answers `answers` to one kind of message.
struct Listener {
    std::vector<int> messages;
    int answersTo = 0;
    OSStatus answer = noErr;
    bool doRectsFit = true;

    static OSStatus Receive(HIShapeEnumerateMessage message, const HIShape*, const CGRect* rect,
                            void* refcon) {
        Listener& listener = *static_cast<Listener*>(refcon);
        listener.messages.push_back(message);
        listener.doRectsFit = listener.doRectsFit && (rect != nullptr) == (message == kHIShapeEnumerateRect);
        return message == listener.answersTo ? listener.answer : noErr;
    }
};

TEST(HIShape, IsEmptyWhenMade) {
    const HIMutableShapeRef shape = HIShapeCreateMutable();
    ASSERT_NE(shape, nullptr);
    EXPECT_TRUE(HIShapeIsEmpty(shape.get()));
    EXPECT_EQ(RectsOf(shape), Rects{});
}

TEST(HIShape, HoldsTheRectangleItIsMadeWith) {
    const HIShapeRef shape = HIShapeCreateWithRect({{-5, 6}, {7, 8}});
    ASSERT_NE(shape, nullptr);
    EXPECT_FALSE(HIShapeIsEmpty(shape.get()));
    EXPECT_EQ(RectsOf(shape.get()), (Rects{{{-5, 6}, {7, 8}}}));
}

TEST(HIShape, IsNotChangedThroughItsCopy) {
    const HIMutableShapeRef original = Shape({{{0, 0}, {4, 4}}, {{8, 8}, {4, 4}}});
    const HIMutableShapeRef copy = HIShapeCreateMutableCopy(original.get());
    EXPECT_EQ(RectsOf(copy), RectsOf(original));
    EXPECT_EQ(HIShapeSetEmpty(copy.get()), noErr);
    EXPECT_TRUE(HIShapeIsEmpty(copy.get()));
    EXPECT_EQ(RectsOf(original).size(), 2u);
}

TEST(HIShape, OfARectangleWithoutAreaCoversNothingAndComplainsNowhere) {
    testing::internal::CaptureStderr();
    for (const CGRect& rect : Rects{{{5, 5}, {0, 9}},
                                    {{5, 5}, {9, 0}},
                                    {{5, 5}, {-3, 9}},
                                    {{5, 5}, {9, -3}},
                                    {{5, 5}, {0.5F, 9}},
                                    {{kNaN, 5}, {0, 9}},
                                    {{5, 5}, {kNaN, 9}},
                                    {{kInfinity, 5}, {9, 9}}}) {
        SCOPED_TRACE(testing::PrintToString(rect));
        EXPECT_TRUE(HIShapeIsEmpty(HIShapeCreateWithRect(rect).get()));
        const HIMutableShapeRef shape = Shape({{{0, 0}, {4, 4}}});
        EXPECT_EQ(HIShapeUnionWithRect(shape.get(), rect), noErr);
        EXPECT_EQ(RectsOf(shape), (Rects{{{0, 0}, {4, 4}}}));
    }
    EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
}

TEST(HIShape, CutsEachEdgeTowardZero) {
    EXPECT_EQ(RectsOf(Shape({{{1.75F, 2.5F}, {1.5F, 3.75F}}})), (Rects{{{1, 2}, {2, 4}}}));
    EXPECT_EQ(RectsOf(Shape({{{-1.75F, -2.5F}, {1.5F, 3.75F}}})), (Rects{{{-1, -2}, {1, 3}}}));
}

TEST(HIShape, StopsAtTheEndsOfTheRange) {
    const HIMutableShapeRef shape = Shape({{{-1e30F, 3}, {2e30F, 1}}});
    EXPECT_EQ(RectsOf(shape), (Rects{{{-2147483648.0F, 3}, {4294967296.0F, 1}}}));
}

TEST(HIShape, HasTheSmallestRectangleAroundItAsBounds) {
    const HIMutableShapeRef shape = Shape({{{3, -9}, {2, 2}}, {{-4, 10}, {1, 5}}});
    CGRect bounds = kTouched;
    EXPECT_EQ(HIShapeGetBounds(shape.get(), &bounds), &bounds);
    EXPECT_EQ(bounds, (CGRect{{-4, -9}, {9, 24}}));
}

TEST(HIShape, HasZeroBoundsWhenItIsEmptyWhateverItWas) {
    const HIMutableShapeRef shape = Shape({{{5, 6}, {7, 8}}});
    const HIShapeRef apart = HIShapeCreateWithRect({{50, 60}, {7, 8}});
    ASSERT_EQ(HIShapeIntersect(shape.get(), apart.get(), shape.get()), noErr);
    CGRect bounds = kTouched;
    EXPECT_EQ(HIShapeGetBounds(shape.get(), &bounds), &bounds);
    EXPECT_EQ(bounds, CGRect{});

    const HIMutableShapeRef emptied = Shape({{{5, 6}, {7, 8}}});
    ASSERT_EQ(HIShapeSetEmpty(emptied.get()), noErr);
    bounds = kTouched;
    EXPECT_EQ(HIShapeGetBounds(emptied.get(), &bounds), &bounds);
    EXPECT_EQ(bounds, CGRect{});
}

TEST(HIShape, CombinesIntoAThirdShapeAndLeavesBothOperands) {
    const HIMutableShapeRef a = Shape({{{0, 0}, {4, 4}}});
    const HIMutableShapeRef b = Shape({{{2, 0}, {4, 4}}});
    const HIMutableShapeRef result = Shape({{{90, 90}, {1, 1}}});
    EXPECT_EQ(HIShapeIntersect(a.get(), b.get(), result.get()), noErr);
    EXPECT_EQ(RectsOf(result), (Rects{{{2, 0}, {2, 4}}}));
    EXPECT_EQ(HIShapeUnion(a.get(), b.get(), result.get()), noErr);
    EXPECT_EQ(RectsOf(result), (Rects{{{0, 0}, {6, 4}}}));
    EXPECT_EQ(HIShapeDifference(a.get(), b.get(), result.get()), noErr);
    EXPECT_EQ(RectsOf(result), (Rects{{{0, 0}, {2, 4}}}));
    EXPECT_EQ(HIShapeXor(a.get(), b.get(), result.get()), noErr);
    EXPECT_EQ(RectsOf(result), (Rects{{{0, 0}, {2, 4}}, {{4, 0}, {2, 4}}}));
    EXPECT_EQ(RectsOf(a), (Rects{{{0, 0}, {4, 4}}}));
    EXPECT_EQ(RectsOf(b), (Rects{{{2, 0}, {4, 4}}}));
}

TEST(HIShape, CombinesIntoEitherOperand) {
    using Operation = OSStatus (*)(const HIShape*, const HIShape*, HIShape*) noexcept;
    for (const Operation operation : {&HIShapeIntersect, &HIShapeUnion, &HIShapeDifference, &HIShapeXor}) {
        const Rects left{{{0, 0}, {4, 4}}, {{10, 2}, {4, 4}}};
        const Rects right{{{2, 1}, {4, 4}}, {{9, 9}, {3, 3}}};
        const HIMutableShapeRef a = Shape(left);
        const HIMutableShapeRef b = Shape(right);
        const HIMutableShapeRef apart = HIShapeCreateMutable();
        ASSERT_EQ(operation(a.get(), b.get(), apart.get()), noErr);

        const HIMutableShapeRef intoFirst = Shape(left);
        EXPECT_EQ(operation(intoFirst.get(), b.get(), intoFirst.get()), noErr);
        EXPECT_EQ(RectsOf(intoFirst), RectsOf(apart));

        const HIMutableShapeRef intoSecond = Shape(right);
        EXPECT_EQ(operation(a.get(), intoSecond.get(), intoSecond.get()), noErr);
        EXPECT_EQ(RectsOf(intoSecond), RectsOf(apart));
    }
}

TEST(HIShape, CombinesWithItself) {
    const Rects rects{{{0, 0}, {4, 4}}, {{10, 2}, {4, 4}}};
    const HIMutableShapeRef shape = Shape(rects);
    const Rects before = RectsOf(shape);
    EXPECT_EQ(HIShapeUnion(shape.get(), shape.get(), shape.get()), noErr);
    EXPECT_EQ(RectsOf(shape), before);
    EXPECT_EQ(HIShapeIntersect(shape.get(), shape.get(), shape.get()), noErr);
    EXPECT_EQ(RectsOf(shape), before);
    EXPECT_EQ(HIShapeXor(shape.get(), shape.get(), shape.get()), noErr);
    EXPECT_TRUE(HIShapeIsEmpty(shape.get()));
}

TEST(HIShape, TellsBandsFromTheTopAndRectanglesFromTheLeft) {
    // A plus sign and, beside its arms, a separate square.
    const HIMutableShapeRef shape = Shape({{{0, 3}, {9, 3}}, {{3, 0}, {3, 9}}, {{12, 4}, {1, 1}}});
    EXPECT_EQ(RectsOf(shape), (Rects{{{3, 0}, {3, 3}},
                                     {{0, 3}, {9, 1}},
                                     {{0, 4}, {9, 1}},
                                     {{12, 4}, {1, 1}},
                                     {{0, 5}, {9, 1}},
                                     {{3, 6}, {3, 3}}}));
}

TEST(HIShape, TellsTheSameRectanglesHoweverItCameAbout) {
    const HIMutableShapeRef whole = Shape({{{0, 0}, {8, 8}}});
    const HIMutableShapeRef quarters =
        Shape({{{4, 4}, {4, 4}}, {{0, 0}, {4, 4}}, {{4, 0}, {4, 4}}, {{0, 4}, {4, 4}}});
    EXPECT_EQ(RectsOf(quarters), RectsOf(whole));
}

TEST(HIShape, IsToldBetweenAnOpeningAndAClosingMessage) {
    Listener listener;
    const HIMutableShapeRef shape = Shape({{{0, 0}, {1, 1}}, {{5, 5}, {1, 1}}});
    EXPECT_EQ(HIShapeEnumerate(shape.get(), kHIShapeParseFromTopLeft, Listener::Receive, &listener), noErr);
    EXPECT_EQ(listener.messages, (std::vector<int>{kHIShapeEnumerateInit, kHIShapeEnumerateRect,
                                                   kHIShapeEnumerateRect, kHIShapeEnumerateTerminate}));
    EXPECT_TRUE(listener.doRectsFit);
}

TEST(HIShape, StopsTellingWhereTheListenerSaysSo) {
    const HIMutableShapeRef shape = Shape({{{0, 0}, {1, 1}}, {{5, 5}, {1, 1}}});
    const std::vector<std::vector<int>> expected{
        {kHIShapeEnumerateInit, kHIShapeEnumerateTerminate},
        {kHIShapeEnumerateInit, kHIShapeEnumerateRect, kHIShapeEnumerateTerminate},
        {kHIShapeEnumerateInit, kHIShapeEnumerateRect, kHIShapeEnumerateRect, kHIShapeEnumerateTerminate}};
    for (int message = kHIShapeEnumerateInit; message <= kHIShapeEnumerateTerminate; ++message) {
        Listener listener;
        listener.answersTo = message;
        listener.answer = 77;
        EXPECT_EQ(HIShapeEnumerate(shape.get(), kHIShapeParseFromTopLeft, Listener::Receive, &listener), 77);
        EXPECT_EQ(listener.messages, expected.at(static_cast<std::size_t>(message - kHIShapeEnumerateInit)));
    }
}

TEST(HIShape, RefusesAnOrderThatIsNotOfferedAndAMissingListener) {
    Listener listener;
    const HIMutableShapeRef shape = Shape({{{0, 0}, {1, 1}}});
    EXPECT_EQ(HIShapeEnumerate(shape.get(), 1, Listener::Receive, &listener), paramErr);
    EXPECT_EQ(HIShapeEnumerate(shape.get(), kHIShapeParseFromTopLeft, nullptr, &listener), paramErr);
    EXPECT_TRUE(listener.messages.empty());
}

TEST(HIShape, AnswersForANullShape) {
    Listener listener;
    CGRect bounds = kTouched;
    EXPECT_EQ(HIShapeCreateMutableCopy(nullptr), nullptr);
    EXPECT_TRUE(HIShapeIsEmpty(nullptr));
    EXPECT_EQ(HIShapeGetBounds(nullptr, &bounds), nullptr);
    EXPECT_EQ(bounds, kTouched);
    EXPECT_EQ(HIShapeSetEmpty(nullptr), paramErr);
    EXPECT_EQ(HIShapeUnionWithRect(nullptr, {{0, 0}, {1, 1}}), paramErr);
    EXPECT_EQ(HIShapeEnumerate(nullptr, kHIShapeParseFromTopLeft, Listener::Receive, &listener), paramErr);
    EXPECT_TRUE(listener.messages.empty());
}

TEST(HIShape, IsLeftAsItWasWhenAnOperandIsNull) {
    const Rects rects{{{0, 0}, {4, 4}}};
    const HIMutableShapeRef shape = Shape(rects);
    for (const auto operation : {&HIShapeIntersect, &HIShapeUnion, &HIShapeDifference, &HIShapeXor}) {
        EXPECT_EQ(operation(nullptr, shape.get(), shape.get()), paramErr);
        EXPECT_EQ(operation(shape.get(), nullptr, shape.get()), paramErr);
        EXPECT_EQ(operation(shape.get(), shape.get(), nullptr), paramErr);
        EXPECT_EQ(RectsOf(shape), rects);
    }
}

/// Runs `change` with memory for 0, 1, 2 … allocations until it succeeds; each failure must leave `shape` as
/// it was.
template <class Change>
void ExpectUnchangedWithoutMemory(const HIMutableShapeRef& shape, Change change) {
    const Rects before = RectsOf(shape);
    OSStatus status = memFullErr;
    int failures = 0;
    for (; status != noErr && failures < 100; ++failures) {
        allocationsLeft = failures;
        status = change();
        allocationsLeft = -1;
        if (status != noErr) {
            EXPECT_EQ(status, memFullErr);
            EXPECT_EQ(RectsOf(shape), before);
        }
    }
    EXPECT_EQ(status, noErr);
    EXPECT_GT(failures, 1) << "memory was never needed, so nothing was shown";
    EXPECT_NE(RectsOf(shape), before);
}

TEST(HIShape, IsLeftAsItWasWhenMemoryRunsOut) {
    if (!TEST_REPLACES_MALLOC)
        GTEST_SKIP() << "a sanitizer's allocator cannot be made to fail";
    const Rects left{{{0, 0}, {4, 4}}, {{10, 2}, {4, 4}}, {{2, 8}, {4, 4}}};
    const HIMutableShapeRef other = Shape({{{2, 1}, {4, 9}}, {{9, 3}, {3, 3}}});
    for (const auto operation : {&HIShapeIntersect, &HIShapeUnion, &HIShapeDifference, &HIShapeXor}) {
        const HIMutableShapeRef shape = Shape(left);
        ExpectUnchangedWithoutMemory(shape, [&] { return operation(shape.get(), other.get(), shape.get()); });
    }
    const HIMutableShapeRef shape = Shape(left);
    ExpectUnchangedWithoutMemory(shape, [&] { return HIShapeUnionWithRect(shape.get(), {{1, 1}, {20, 2}}); });
}

TEST(HIShape, IsNullWhenThereIsNoMemoryForIt) {
    if (!TEST_REPLACES_MALLOC)
        GTEST_SKIP() << "a sanitizer's allocator cannot be made to fail";
    const HIMutableShapeRef original = Shape({{{0, 0}, {4, 4}}, {{10, 2}, {4, 4}}});
    allocationsLeft = 0;
    const HIMutableShapeRef made = HIShapeCreateMutable();
    const HIShapeRef madeWithRect = HIShapeCreateWithRect({{0, 0}, {1, 1}});
    const HIMutableShapeRef copyWithoutShape = HIShapeCreateMutableCopy(original.get());
    allocationsLeft = 1;
    const HIMutableShapeRef copyWithoutRects = HIShapeCreateMutableCopy(original.get());
    allocationsLeft = -1;
    EXPECT_EQ(made, nullptr);
    EXPECT_EQ(madeWithRect, nullptr);
    EXPECT_EQ(copyWithoutShape, nullptr);
    EXPECT_EQ(copyWithoutRects, nullptr);
}

} // namespace
} // namespace platform
