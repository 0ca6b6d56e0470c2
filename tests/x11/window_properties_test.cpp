// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/window_properties.h"

#include <gtest/gtest.h>
#include <xcb/res.h>

#include <cstring>
#include <limits>
#include <string>
#include <vector>

namespace {

using namespace platform::x11;
using platform::CGRect;

constexpr xcb_atom_t UTF8 = 300;
constexpr int WIDTH = 1920;
constexpr int HEIGHT = 1080;
constexpr std::uint32_t HUGE_WORD = std::numeric_limits<std::uint32_t>::max();

std::vector<std::uint8_t> BytesOf(const std::vector<std::uint32_t>& words) {
    std::vector<std::uint8_t> bytes(words.size() * sizeof(std::uint32_t));
    if (!bytes.empty())
        std::memcpy(bytes.data(), words.data(), bytes.size());
    return bytes;
}

Property Words(const std::vector<std::uint32_t>& words, xcb_atom_t type = XCB_ATOM_CARDINAL) {
    return {type, 32, BytesOf(words)};
}

Property Text(const std::string& text, xcb_atom_t type = XCB_ATOM_STRING) {
    return {type, 8, {text.begin(), text.end()}};
}

/// A reply as it lies in memory, which may claim to hold more than has come.
std::vector<std::uint32_t> Reply(std::uint8_t format, std::uint32_t claimed,
                                 const std::vector<std::uint32_t>& words) {
    xcb_get_property_reply_t head{};
    head.format = format;
    head.length = static_cast<std::uint32_t>(words.size());
    head.type = XCB_ATOM_CARDINAL;
    head.value_len = claimed;
    std::vector<std::uint32_t> memory(sizeof head / sizeof(std::uint32_t) + words.size());
    std::memcpy(memory.data(), &head, sizeof head);
    std::copy(words.begin(), words.end(), memory.begin() + sizeof head / sizeof(std::uint32_t));
    return memory;
}

Property PropertyOf(const std::vector<std::uint32_t>& reply) {
    return Property::From(reinterpret_cast<const xcb_get_property_reply_t*>(reply.data()));
}

TEST(Property, IsEmptyWithoutAReply) {
    EXPECT_FALSE(Property::From(nullptr).IsThere());
}

TEST(Property, TakesNoMoreThanHasCome) {
    EXPECT_EQ(PropertyOf(Reply(32, 2, {7, 8})).Words(), (std::vector<std::uint32_t>{7, 8}));
    EXPECT_EQ(PropertyOf(Reply(32, 1, {7, 8})).Words(), (std::vector<std::uint32_t>{7}));
    EXPECT_EQ(PropertyOf(Reply(32, HUGE_WORD, {7, 8})).Words(), (std::vector<std::uint32_t>{7, 8}));
    EXPECT_EQ(PropertyOf(Reply(8, 3, {7, 8})).bytes.size(), 3U);
    EXPECT_FALSE(PropertyOf(Reply(64, 1, {7, 8})).IsThere());
}

TEST(Property, HasWordsOnlyWhenItIsMadeOfThem) {
    EXPECT_TRUE(Text("abcd").Words().empty());
    EXPECT_FALSE(Text("abcd").FirstWord());
    EXPECT_FALSE(Words({}).FirstWord());
    EXPECT_EQ(Words({5}, UTF8).FirstWord(), 5U);
    EXPECT_TRUE(Words({5}, UTF8).Cardinals().empty()) << "not a number by its type";
    EXPECT_TRUE(Words({5, 6}, XCB_ATOM_ATOM).Names(6));
    EXPECT_FALSE(Words({5, 6}, XCB_ATOM_ATOM).Names(7));
    EXPECT_FALSE(Words({5, 6}).Names(6));
    EXPECT_FALSE(Words({0}, XCB_ATOM_ATOM).Names(XCB_ATOM_NONE));
}

TEST(TitleFrom, PrefersUtf8AndMendsIt) {
    EXPECT_EQ(TitleFrom(Text("\xC3\xA9t\xC3\xA9", UTF8), Text("other"), UTF8), "\xC3\xA9t\xC3\xA9");
    EXPECT_EQ(TitleFrom(Text("a\xFFz", UTF8), {}, UTF8), "a\xEF\xBF\xBDz");
    EXPECT_EQ(TitleFrom({}, Text("caf\xE9"), UTF8), "caf\xC3\xA9");
    EXPECT_EQ(TitleFrom({}, Text("\xC3\xA9", UTF8), UTF8), "\xC3\xA9");
    EXPECT_EQ(TitleFrom(Words({1, 2}, UTF8), Text("plain"), UTF8), "plain");
    EXPECT_EQ(TitleFrom({}, {}, UTF8), "");
}

TEST(TitleFrom, LeavesOutControlCharacters) {
    EXPECT_EQ(TitleFrom(Text(std::string("\0\x1B[2Ja\r\nb\x7F\0", 11), UTF8), {}, UTF8), "[2Ja b");
    EXPECT_EQ(TitleFrom({},
                        Text("a\x85"
                             "b"),
                        UTF8),
              "a b");
    EXPECT_EQ(TitleFrom(Text("\xC2\x9B"
                             "1m",
                             UTF8),
                        {}, UTF8),
              "1m");
}

TEST(PidFrom, RefusesWhatIsNoPid) {
    EXPECT_EQ(PidFrom(Words({4321})), 4321);
    EXPECT_EQ(PidFrom(Words({1U << 22U})), 1 << 22);
    EXPECT_FALSE(PidFrom(Words({0})));
    EXPECT_FALSE(PidFrom(Words({(1U << 22U) + 1})));
    EXPECT_FALSE(PidFrom(Words({HUGE_WORD})));
    EXPECT_FALSE(PidFrom(Words({})));
    EXPECT_FALSE(PidFrom(Words({5}, XCB_ATOM_ATOM)));
    EXPECT_FALSE(PidFrom(Text("1234")));
}

TEST(PidFromClientIds, ReadsTheFirstLocalPidAndNothingBeyondTheEnd) {
    constexpr std::uint32_t PID = XCB_RES_CLIENT_ID_MASK_LOCAL_CLIENT_PID;
    EXPECT_EQ(PidFromClientIds(BytesOf({7, PID, 4, 99})), 99);
    EXPECT_EQ(PidFromClientIds(BytesOf({7, 1, 8, 1, 2, 7, PID, 4, 99})), 99);
    EXPECT_FALSE(PidFromClientIds(BytesOf({7, PID, 0, 99})));
    EXPECT_FALSE(PidFromClientIds(BytesOf({7, PID, 400, 99})));
    EXPECT_FALSE(PidFromClientIds(BytesOf({7, PID, HUGE_WORD, 99})));
    EXPECT_FALSE(PidFromClientIds(BytesOf({7, PID, 4, HUGE_WORD})));
    EXPECT_FALSE(PidFromClientIds(BytesOf({7, PID, 4})));
    EXPECT_FALSE(PidFromClientIds({}));
}

TEST(OwnerFrom, BelievesThePropertyOfThisMachineElseTheServer) {
    EXPECT_EQ(OwnerFrom({5, 6, false}, 1), 5);
    EXPECT_EQ(OwnerFrom({5, 6, true}, 1), 6);
    EXPECT_EQ(OwnerFrom({5, {}, true}, 1), 0);
    EXPECT_EQ(OwnerFrom({{}, 6, false}, 1), 6);
    EXPECT_EQ(OwnerFrom({}, 1), 0);
}

TEST(OwnerFrom, SaysOursWhenEitherDoes) {
    EXPECT_EQ(OwnerFrom({5, 6, false}, 6), 6);
    EXPECT_EQ(OwnerFrom({5, 6, false}, 5), 5);
    EXPECT_EQ(OwnerFrom({5, 6, true}, 5), 6) << "the same number on another machine";
}

TEST(IsOtherMachine, ComparesNamesUpToTheirEnd) {
    EXPECT_FALSE(IsOtherMachine({}, "here"));
    EXPECT_FALSE(IsOtherMachine(Text("here"), "here"));
    EXPECT_FALSE(IsOtherMachine(Text(std::string("here\0", 5)), "here"));
    EXPECT_TRUE(IsOtherMachine(Text("there"), "here"));
    EXPECT_FALSE(IsOtherMachine(Words({1}), "here"));
}

TEST(ClassFrom, TakesTheSecondText) {
    EXPECT_EQ(ClassFrom(Text(std::string("name\0Class\0", 11))), "Class");
    EXPECT_EQ(ClassFrom(Text(std::string("name\0Class", 10))), "Class");
    EXPECT_EQ(ClassFrom(Text("name")), "");
    EXPECT_EQ(ClassFrom(Text(std::string("\0\0", 2))), "");
    EXPECT_EQ(ClassFrom(Text("")), "");
}

TEST(OpacityFrom, LiesBetweenNoneAndAllAndIsAllByItself) {
    EXPECT_EQ(OpacityFrom(Words({0})), 0.0F);
    EXPECT_EQ(OpacityFrom(Words({HUGE_WORD})), 1.0F);
    EXPECT_NEAR(OpacityFrom(Words({0x80000000})), 0.5F, 1e-6F);
    EXPECT_EQ(OpacityFrom({}), 1.0F);
    EXPECT_EQ(OpacityFrom(Text("\0\0\0\0")), 1.0F);
}

TEST(TypeFrom, TakesTheFirstKnownType) {
    const std::vector<std::pair<xcb_atom_t, WindowType>> names = {{10, WindowType::Dock},
                                                                  {11, WindowType::Menu}};
    EXPECT_EQ(TypeFrom(Words({99, 11, 10}, XCB_ATOM_ATOM), names), WindowType::Menu);
    EXPECT_EQ(TypeFrom(Words({99}, XCB_ATOM_ATOM), names), WindowType::Unset);
    EXPECT_EQ(TypeFrom(Words({10}), names), WindowType::Unset);
    EXPECT_EQ(TypeFrom({}, names), WindowType::Unset);
}

TEST(EdgesFrom, MeansNothingWhenOneOfThemIsBeyondTheLimit) {
    EXPECT_EQ(EdgesFrom(Words({1, 2, 3, 4}), 100), (Edges{1, 2, 3, 4}));
    EXPECT_EQ(EdgesFrom(Words({1, 2, 3, 4, HUGE_WORD}), 100), (Edges{1, 2, 3, 4}));
    EXPECT_EQ(EdgesFrom(Words({1, 2, 101, 4}), 100), Edges());
    EXPECT_EQ(EdgesFrom(Words({HUGE_WORD, 2, 3, 4}), 100), Edges()) << "a negative number";
    EXPECT_EQ(EdgesFrom(Words({1, 2, 3}), 100), Edges());
    EXPECT_EQ(EdgesFrom(Words({1, 2, 3, 4}, XCB_ATOM_ATOM), 100), Edges());
}

TEST(StrutFrom, PrefersThePartialOne) {
    const Strut strut =
        StrutFrom(Words({0, 0, 0, 40, 0, 0, 0, 0, 0, 0, 100, 900}), Words({1, 2, 3, 4}), WIDTH, HEIGHT);
    EXPECT_EQ(strut.size, (Edges{0, 0, 0, 40}));
    EXPECT_EQ(strut.bottomStart, 100);
    EXPECT_EQ(strut.bottomEnd, 900);
    const Strut whole = StrutFrom(Words({1, 2, 3}), Words({10, 20, 30, 40}), WIDTH, HEIGHT);
    EXPECT_EQ(whole.size, (Edges{10, 20, 30, 40}));
    EXPECT_EQ(whole.leftEnd, HEIGHT - 1);
    EXPECT_EQ(whole.topEnd, WIDTH - 1);
}

TEST(StrutFrom, ReservesNothingBeyondTheRootAndNothingThatEndsBeforeItBegins) {
    EXPECT_TRUE(StrutFrom({}, {}, WIDTH, HEIGHT).IsEmpty());
    EXPECT_TRUE(StrutFrom({}, Words({HUGE_WORD, WIDTH + 1, HEIGHT + 1, HUGE_WORD}), WIDTH, HEIGHT).IsEmpty());
    EXPECT_TRUE(StrutFrom(Words({0, 0, 0, 40, 0, 0, 0, 0, 0, 0, 900, 100}), {}, WIDTH, HEIGHT).IsEmpty());
    EXPECT_TRUE(
        StrutFrom(Words({0, 0, 0, 40, 0, 0, 0, 0, 0, 0, WIDTH, HUGE_WORD}), {}, WIDTH, HEIGHT).IsEmpty());
    EXPECT_EQ(StrutFrom(Words({0, 0, 0, 40, 0, 0, 0, 0, 0, 0, 5, HUGE_WORD}), {}, WIDTH, HEIGHT).bottomEnd,
              WIDTH - 1);
    EXPECT_TRUE(StrutFrom({}, Words({10, 10, 10, 10}), 0, 0).IsEmpty());
}

TEST(VisibleBounds, CountsStrutsFromTheRootsEdgesOnTheDisplaysThatTheyTouch) {
    const CGRect left{{0, 0}, {960, 1080}};
    const CGRect right{{960, 0}, {960, 1080}};
    const std::vector<Strut> struts = {
        StrutFrom(Words({0, 0, 30, 0, 0, 0, 0, 0, 0, 959, 0, 0}), {}, WIDTH, HEIGHT),
        StrutFrom(Words({0, 50, 0, 0, 0, 0, 0, 1079, 0, 0, 0, 0}), {}, WIDTH, HEIGHT)};
    EXPECT_EQ(VisibleBounds(left, struts, WIDTH, HEIGHT), (CGRect{{0, 30}, {960, 1050}}));
    EXPECT_EQ(VisibleBounds(right, struts, WIDTH, HEIGHT), (CGRect{{960, 0}, {910, 1080}}));
}

TEST(VisibleBounds, TakesAStrutAcrossAWholeDisplayForOneOfTheNextDisplay) {
    const std::vector<Strut> struts = {StrutFrom({}, Words({1000, 0, 0, 0}), WIDTH, HEIGHT)};
    EXPECT_EQ(VisibleBounds({{0, 0}, {960, 1080}}, struts, WIDTH, HEIGHT), (CGRect{{0, 0}, {960, 1080}}));
    EXPECT_EQ(VisibleBounds({{960, 0}, {960, 1080}}, struts, WIDTH, HEIGHT),
              (CGRect{{1000, 0}, {920, 1080}}));
}

TEST(VisibleBounds, StaysWholeWhenNothingWouldBeLeft) {
    const CGRect display{{0, 0}, {1920, 1080}};
    const std::vector<Strut> struts = {StrutFrom({}, Words({1000, 1000, 0, 0}), WIDTH, HEIGHT)};
    EXPECT_EQ(VisibleBounds(display, struts, WIDTH, HEIGHT), display);
    EXPECT_EQ(VisibleBounds(display, {}, WIDTH, HEIGHT), display);
}

} // namespace
