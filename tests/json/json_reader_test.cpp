// SPDX-License-Identifier: Apache-2.0
#include "json/json.h"

#include <gtest/gtest.h>

#include <clocale>
#include <stdexcept>
#include <string>

// What the reader makes of texts, the odd ones above all.

namespace {

using json::Deserialize;
using json::Value;

/// Reads {"k":text} and gives what stands under the key.
Value Member(const std::string& text) {
    const Value document = Deserialize("{\"k\":" + text + "}");
    EXPECT_EQ(document.GetType(), json::ObjectVal) << text;
    return document.GetType() == json::ObjectVal && document.HasKey("k") ? document["k"] : Value();
}

std::string StringOf(const std::string& text) {
    const Value value = Member(text);
    EXPECT_EQ(value.GetType(), json::StringVal) << text;
    return value.GetType() == json::StringVal ? value.ToString() : "";
}

bool IsNull(const std::string& document) {
    return Deserialize(document).GetType() == json::NULLVal;
}

} // namespace

TEST(JsonReader, GivesNullForAnEmptyTextAndForBlanks) {
    EXPECT_TRUE(IsNull(""));
    EXPECT_TRUE(IsNull(" \t\r\n\v\f "));
    EXPECT_TRUE(IsNull(std::string(3, '\0')));
}

TEST(JsonReader, GivesNullForADocumentThatIsNoStructure) {
    for (const char* text : {"5", "\"a\"", "true", "null", "-1.5", "abc", "{", "[", "}", "]", "{]", "[}"})
        EXPECT_TRUE(IsNull(text)) << text;
}

TEST(JsonReader, ReadsEmptyStructures) {
    EXPECT_EQ(Deserialize("{}").GetType(), json::ObjectVal);
    EXPECT_EQ(Deserialize("{}").size(), 0u);
    EXPECT_EQ(Deserialize("[]").GetType(), json::ArrayVal);
    EXPECT_EQ(Deserialize("[]").size(), 0u);
    EXPECT_EQ(Deserialize("[ ]").GetType(), json::ArrayVal);
    EXPECT_EQ(Deserialize("[ ]").size(), 0u);
    EXPECT_EQ(Deserialize(" {} ").GetType(), json::ObjectVal);
}

TEST(JsonReader, FailsOnAnObjectOfBlanks) {
    EXPECT_TRUE(IsNull("{ }"));
}

TEST(JsonReader, FailsOnACommaBehindTheLastMemberAndForgivesOneBehindTheLastElement) {
    EXPECT_TRUE(IsNull("{\"a\":1,}"));
    EXPECT_EQ(Deserialize("[1,]").size(), 1u);
}

TEST(JsonReader, SkipsWhatStandsBetweenMembers) {
    const Value both = Deserialize("{\"a\":\"x\" \"b\":2}");
    ASSERT_EQ(both.size(), 2u);
    EXPECT_EQ(both["a"].ToString(), "x");
    EXPECT_EQ(static_cast<int>(both["b"]), 2);
    EXPECT_EQ(Deserialize("{stray\"a\":\"x\" more, text \"b\":2}").size(), 2u);
}

TEST(JsonReader, LetsABareTokenRunToTheEnd) {
    const Value one = Deserialize("{\"a\":1 \"b\":2}");
    ASSERT_EQ(one.size(), 1u);
    EXPECT_EQ(one["a"].GetType(), json::IntVal);
    EXPECT_EQ(static_cast<int>(one["a"]), 1);
}

TEST(JsonReader, TakesAClosingBraceIntoAToken) {
    const Value value = Deserialize("{\"a\":1}}");
    ASSERT_EQ(value.GetType(), json::ObjectVal);
    EXPECT_EQ(static_cast<int>(value["a"]), 1);
}

TEST(JsonReader, FailsOnABracketThatClosesSomethingElse) {
    EXPECT_TRUE(IsNull("{\"a\":1]}"));
    EXPECT_TRUE(IsNull("{\"a\":[1}}"));
    EXPECT_TRUE(IsNull("{\"a\":{1]}}"));
}

TEST(JsonReader, FailsOnAKeyThatIsMissingOrEmpty) {
    for (const char* text : {"{1}", "{:1}", "{\"a\"}", "{\"a}", "{\"\":1}", "{\"a\" 1}", "{a:1}"})
        EXPECT_TRUE(IsNull(text)) << text;
}

TEST(JsonReader, TakesAKeyAsItStandsAndLetsTheLastOneWin) {
    const Value value = Deserialize("{\"a\\n\":1,\" b \":2,\"c\":3,\"c\":\"x\"}");
    EXPECT_TRUE(value.HasKey("a\\n"));
    EXPECT_TRUE(value.HasKey(" b "));
    EXPECT_EQ(value["c"].ToString(), "x");
}

TEST(JsonReader, TrimsStringsAfterTheirEscapesWereResolved) {
    EXPECT_EQ(StringOf("\"  x  \""), "x");
    EXPECT_EQ(StringOf("\"\\n x y \\t\""), "x y");
    EXPECT_EQ(StringOf("\"\\u0000x\""), "x");
}

TEST(JsonReader, ResolvesEscapes) {
    EXPECT_EQ(StringOf(R"("a\"b\/c\\d")"), "a\"b/c\\d");
    EXPECT_EQ(StringOf(R"("a\bb\fc\nd\re\tf")"), "a\bb\fc\nd\re\tf");
    EXPECT_EQ(StringOf(R"("\q")"), "");
    EXPECT_EQ(StringOf(R"("a\qb")"), "ab");
}

TEST(JsonReader, TakesTheLastTwoDigitsOfAUnicodeEscapeAsOneByte) {
    EXPECT_EQ(StringOf(R"("\u0041")"), "A");
    EXPECT_EQ(StringOf(R"("\u1241")"), "A");
    EXPECT_EQ(StringOf(R"("\u00e9")"), "\xE9");
    EXPECT_EQ(StringOf(R"("\u00E9x")"), "\xE9x");
    EXPECT_EQ(StringOf(R"("x\u00zzy")"), std::string("x\0y", 3));
}

TEST(JsonReader, ThrowsOutOfRangeWhereTheStringEndsInsideAUnicodeEscape) {
    EXPECT_THROW(Deserialize(R"({"s":"\u"})"), std::out_of_range);
    EXPECT_THROW(Deserialize(R"({"s":"\u1"})"), std::out_of_range);
    EXPECT_NO_THROW(Deserialize(R"({"s":"\u12"})"));
    EXPECT_NO_THROW(Deserialize(R"({"s":"\u123"})"));
}

TEST(JsonReader, FailsOnAStringWithoutAnEnd) {
    EXPECT_TRUE(IsNull(R"({"a":"x})"));
    EXPECT_TRUE(IsNull(R"({"a":"x\"})"));
}

TEST(JsonReader, ReadsLiteralsInAnyCapitals) {
    EXPECT_TRUE(Member("TRUE").ToBool());
    EXPECT_TRUE(Member("tRuE").ToBool());
    EXPECT_FALSE(Member("False").ToBool());
    const Value null = Deserialize("{\"a\":nUlL}");
    EXPECT_TRUE(null.HasKey("a"));
    EXPECT_EQ(null["a"].GetType(), json::NULLVal);
}

TEST(JsonReader, DropsWhiteSpaceInsideATokenAndTakesAnEmptyOneForNull) {
    EXPECT_EQ(static_cast<int>(Member("1 2")), 12);
    EXPECT_TRUE(Member("t r\tu e").ToBool());
    const Value empty = Deserialize("{\"a\":}");
    EXPECT_TRUE(empty.HasKey("a"));
    EXPECT_EQ(empty["a"].GetType(), json::NULLVal);
}

TEST(JsonReader, TypesNumbersByTheirRange) {
    struct Case {
        const char* text;
        json::ValueType type;
        double value;
    };
    const Case cases[] = {{"2147483647", json::IntVal, 2147483647.0},
                          {"-2147483648", json::IntVal, -2147483648.0},
                          {"2147483648", json::UIntVal, 2147483648.0},
                          {"3000000000", json::UIntVal, 3000000000.0},
                          {"4294967295", json::UIntVal, 4294967295.0},
                          {"4294967296", json::DoubleVal, 4294967296.0},
                          {"5000000000", json::DoubleVal, 5000000000.0},
                          {"-3000000000", json::DoubleVal, -3000000000.0},
                          {"1.0", json::DoubleVal, 1.0},
                          {"1e3", json::DoubleVal, 1000.0},
                          {"1E3", json::IntVal, 1.0},
                          {"1E5", json::IntVal, 1.0},
                          {"abc", json::IntVal, 0.0},
                          {"hello", json::DoubleVal, 0.0},
                          {"-7", json::IntVal, -7.0}};
    for (const Case& one : cases) {
        SCOPED_TRACE(one.text);
        const Value value = Member(one.text);
        EXPECT_EQ(value.GetType(), one.type);
        EXPECT_EQ(static_cast<double>(value), one.value);
    }
    EXPECT_EQ(static_cast<int>(Member("1.0")), 1);
}

TEST(JsonReader, HoldsTheViewsOfAHugeNumberAtTheirEnds) {
    const Value huge = Member("1.5e300");
    EXPECT_EQ(static_cast<int>(huge), 2147483647);
    EXPECT_EQ(static_cast<unsigned>(huge), 4294967295u);
    EXPECT_EQ(static_cast<int>(Member("-1.5e300")), -2147483647 - 1);
    EXPECT_EQ(static_cast<unsigned>(Member("-1.5")), 0u);
    EXPECT_EQ(static_cast<int>(Member("nan.")), 0);
}

TEST(JsonReader, ReadsAPointWhateverTheLocaleSays) {
    const std::string before = std::setlocale(LC_ALL, nullptr);
    for (const char* locale : {"de_DE.UTF-8", "fr_FR.UTF-8", "C"}) {
        if (std::setlocale(LC_ALL, locale) == nullptr)
            continue;
        EXPECT_EQ(static_cast<double>(Member("1.5")), 1.5);
        EXPECT_EQ(json::Serialize(Deserialize("[1.5]")), "[1.500000]");
    }
    std::setlocale(LC_ALL, before.c_str());
}

TEST(JsonReader, KnowsNoQuotesInsideAnArray) {
    EXPECT_TRUE(IsNull("[\"a,b\"]"));
    EXPECT_TRUE(IsNull("[\"a]b\"]"));
    EXPECT_EQ(Deserialize("[\"a\",\"b\"]").size(), 2u);
}

TEST(JsonReader, KeepsNoNullsAndNoEmptyElements) {
    EXPECT_EQ(Deserialize("[1,null,2]").size(), 2u);
    EXPECT_EQ(Deserialize("[1,,2]").size(), 2u);
    EXPECT_EQ(Deserialize("[,]").size(), 0u);
}

TEST(JsonReader, ReadsNestedStructures) {
    const Value value = Deserialize("[{\"a\":[1,2]},[3]]");
    ASSERT_EQ(value.size(), 2u);
    EXPECT_EQ(value[std::size_t{0}]["a"].size(), 2u);
    EXPECT_EQ(static_cast<int>(value[std::size_t{1}][std::size_t{0}]), 3);
    EXPECT_EQ(json::Serialize(Deserialize("{\"a\":{\"b\":{\"c\":[[],{}]}},\"d\":1}")),
              "{\"a\":{\"b\":{\"c\":[[],{}]}},\"d\":1}");
}

TEST(JsonReader, MakesABrokenStructureNullAndLetsTheRestLive) {
    const Value value = Deserialize("{\"a\":{\"x\":1,},\"b\":2}");
    ASSERT_EQ(value.GetType(), json::ObjectVal);
    EXPECT_EQ(value["a"].GetType(), json::NULLVal);
    EXPECT_EQ(static_cast<int>(value["b"]), 2);
}

TEST(JsonReader, TakesAStringThatEndsInABackslashForOneThatGoesOn) {
    // The end of the inner structure is looked for by a rule that sees "x\\" as not ended.
    EXPECT_TRUE(IsNull(R"({"a":{"b":"x\\"}})"));
    EXPECT_EQ(Deserialize(R"({"b":"x\\"})")["b"].ToString(), "x\\");
}

TEST(JsonReader, GivesAFreshResultForEachText) {
    EXPECT_TRUE(IsNull("{\"a\":[1}"));
    EXPECT_EQ(Deserialize("{\"a\":[1]}").size(), 1u);
}

TEST(JsonReader, ReadsStructuresDownToItsDepthAndNullBelow) {
    const auto nested = [](int depth) {
        return std::string(static_cast<std::size_t>(depth), '[') + "1" +
               std::string(static_cast<std::size_t>(depth), ']');
    };
    const auto depthOf = [](const Value& document) {
        int depth = 0;
        for (const Value* value = &document; value->GetType() == json::ArrayVal;
             value = &(*value)[std::size_t{0}]) {
            ++depth;
            if (value->size() == 0)
                break;
        }
        return depth;
    };
    EXPECT_EQ(depthOf(Deserialize(nested(json::MAX_DEPTH + 1))), json::MAX_DEPTH + 1);
    EXPECT_EQ(depthOf(Deserialize(nested(json::MAX_DEPTH + 2))), json::MAX_DEPTH + 1);
    EXPECT_EQ(Deserialize(nested(200000)).GetType(), json::ArrayVal);
    std::string objects;
    for (int i = 0; i < 100000; ++i)
        objects += "{\"a\":";
    EXPECT_TRUE(IsNull(objects));
    EXPECT_TRUE(IsNull(std::string(100000, '[')));
}
