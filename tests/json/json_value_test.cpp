// SPDX-License-Identifier: Apache-2.0
#include "json/json.h"

#include <gtest/gtest.h>

#include <limits>
#include <random>
#include <string>
#include <vector>

// Values, their views and their equality; the writer.

namespace {

using json::Array;
using json::Object;
using json::Serialize;
using json::Value;

Value ObjectOf(const std::string& key, const Value& value) {
    Object object;
    object[key] = value;
    return Value(object);
}

Value ArrayOf(const std::vector<Value>& values) {
    Array array;
    for (const Value& value : values)
        array.push_back(value);
    return Value(array);
}

} // namespace

TEST(JsonValue, IsNullAndOfSizeOneAtFirst) {
    const Value value;
    EXPECT_EQ(value.GetType(), json::NULLVal);
    EXPECT_EQ(value.size(), 1u);
    EXPECT_FALSE(value.IsNumeric());
}

TEST(JsonValue, FillsAllViewsOfANumber) {
    const Value minusOne(-1);
    EXPECT_EQ(static_cast<unsigned>(minusOne), 4294967295u);
    EXPECT_EQ(static_cast<double>(minusOne), -1.0);
    const Value large(3000000000u);
    EXPECT_EQ(static_cast<int>(large), -1294967296);
    EXPECT_EQ(static_cast<double>(large), 3000000000.0);
    const Value real(2.75);
    EXPECT_EQ(static_cast<int>(real), 2);
    EXPECT_EQ(static_cast<unsigned>(real), 2u);
    EXPECT_EQ(static_cast<float>(real), 2.75F);
    const Value single(-2.5F);
    EXPECT_EQ(static_cast<int>(single), -2);
    EXPECT_EQ(static_cast<double>(single), -2.5);
    EXPECT_EQ(static_cast<int>(Value(std::numeric_limits<double>::quiet_NaN())), 0);
}

TEST(JsonValue, CopiesWhatItsTypeSays) {
    for (const Value& value : {Value(), Value(-3), Value(7u), Value(1.5F), Value(-2.5), Value(true),
                               Value("x"), ArrayOf({Value(1)}), ObjectOf("a", Value(2))}) {
        const Value copy(value);
        Value assigned("before");
        assigned = value;
        EXPECT_EQ(copy.GetType(), value.GetType());
        EXPECT_TRUE(copy == value);
        EXPECT_TRUE(assigned == value);
        EXPECT_EQ(assigned.GetType(), value.GetType());
    }
    Value self(5);
    Value& alias = self;
    self = alias;
    EXPECT_EQ(static_cast<int>(self), 5);
}

TEST(JsonValue, IsNullAfterClear) {
    Value value("x");
    value.Clear();
    EXPECT_EQ(value.GetType(), json::NULLVal);
    EXPECT_TRUE(value == Value());
}

TEST(JsonValue, InsertsANullForAnAbsentKey) {
    Value value = ObjectOf("a", Value(1));
    EXPECT_EQ(value["b"].GetType(), json::NULLVal);
    EXPECT_EQ(value.size(), 2u);
    value[std::string("c")] = Value("x");
    EXPECT_TRUE(value.HasKey("c"));
}

TEST(JsonValue, TellsTheFirstMissingKey) {
    const Value value = ObjectOf("a", Value(1));
    EXPECT_EQ(value.HasKeys(std::vector<std::string>{}), -1);
    EXPECT_EQ(value.HasKeys({"a"}), -1);
    EXPECT_EQ(value.HasKeys({"a", "b", "c"}), 1);
    const char* keys[] = {"a", "z"};
    EXPECT_EQ(value.HasKeys(keys, 1), -1);
    EXPECT_EQ(value.HasKeys(keys, 2), 1);
    EXPECT_EQ(value.HasKeys(keys, 0), -1);
}

TEST(JsonValue, EqualsByTheNarrowerFloatingType) {
    EXPECT_TRUE(Value(-1) == Value(4294967295u));
    EXPECT_TRUE(Value(1) == Value(1.0));
    EXPECT_FALSE(Value(1) == Value(1.5));
    EXPECT_TRUE(Value(16777217) == Value(16777216.0F)); // as floats they are the same
    EXPECT_FALSE(Value(16777217) == Value(16777216.0));
    EXPECT_TRUE(Value(0.1F) == Value(0.1));
    EXPECT_FALSE(Value(1) == Value("1"));
    EXPECT_FALSE(Value(1) == Value(true));
    EXPECT_FALSE(Value() == Value(0));
    EXPECT_TRUE(Value(true) == Value(true));
    EXPECT_FALSE(Value(true) == Value(false));
}

TEST(JsonValue, EqualsStructuresMemberByMember) {
    EXPECT_TRUE(ArrayOf({Value(1), Value("x")}) == ArrayOf({Value(1.0), Value("x")}));
    EXPECT_FALSE(ArrayOf({Value(1)}) == ArrayOf({Value(1), Value(2)}));
    EXPECT_TRUE(ObjectOf("a", Value(1)) == ObjectOf("a", Value(1u)));
    EXPECT_FALSE(ObjectOf("a", Value(1)) == ObjectOf("b", Value(1)));
    EXPECT_FALSE(ObjectOf("a", Value(1)) == ArrayOf({Value(1)}));
}

TEST(JsonArray, InsertsFindsAndClears) {
    Array array;
    array.push_back(Value(1));
    array.push_back(Value(3));
    array.insert(1, Value(2));
    array.insert(3, Value(4));
    EXPECT_EQ(Serialize(Value(array)), "[1,2,3,4]");
    EXPECT_EQ(array.find(Value(3.0)) - array.begin(), 2);
    EXPECT_EQ(array.find(Value(9)), array.end());
    EXPECT_TRUE(array.HasValue(Value(4u)));
    EXPECT_FALSE(array.HasValue(Value("4")));
    array.Clear();
    EXPECT_EQ(array.size(), 0u);
}

TEST(JsonWriter, WritesMembersInTheOrderOfTheirBytes) {
    Object object;
    object["b"] = Value(1);
    object["a"] = Value(2.0);
    object["A"] = Value();
    object["\xC3\xA4"] = Value(false);
    EXPECT_EQ(Serialize(Value(object)), "{\"A\":null,\"a\":2.000000,\"b\":1,\"\xC3\xA4\":false}");
}

TEST(JsonWriter, WritesEachType) {
    EXPECT_EQ(Serialize(ArrayOf({Value(), Value("x"), Value(-5), Value(1.5F), Value(-1.25),
                                 Value(4294967295u), Value(true), ArrayOf({}), Value(Object())})),
              "[null,\"x\",-5,1.500000,-1.250000,4294967295,true,[],{}]");
}

TEST(JsonWriter, WritesNothingForWhatIsNoStructure) {
    for (const Value& value : {Value(), Value("x"), Value(1), Value(1.5), Value(true)})
        EXPECT_EQ(Serialize(value), "");
}

TEST(JsonWriter, EscapesNothing) {
    EXPECT_EQ(Serialize(ObjectOf("a\"b", Value("c\"d\n"))), "{\"a\"b\":\"c\"d\n\"}");
}

TEST(JsonWriter, IsReadBackForIntegersBoolsAndPlainStrings) {
    const unsigned seed = std::random_device{}();
    std::mt19937 random(seed);
    SCOPED_TRACE(seed);
    for (int round = 0; round < 500; ++round) {
        Object object;
        for (int i = 0; i < 20; ++i) {
            const std::string key = "k" + std::to_string(random() % 50);
            switch (random() % 4) {
                case 0:
                    object[key] = Value(static_cast<int>(random()));
                    break;
                case 1:
                    object[key] = Value(random() % 2 == 0);
                    break;
                case 2:
                    object[key] = Value("s" + std::to_string(random()));
                    break;
                default:
                    object[key] = ArrayOf({Value(static_cast<int>(random())), Value("t")});
            }
        }
        const Value value(object);
        EXPECT_TRUE(json::Deserialize(Serialize(value)) == value) << Serialize(value);
    }
}

TEST(JsonMisuse, EndsTheProcessInEveryKindOfBuild) {
    Value null;
    const Value text("x");
    const Value object = ObjectOf("a", Value(1));
    const char* keys[] = {"a"};
    EXPECT_DEATH(null[std::size_t{0}], "mValueType == ArrayVal");
    EXPECT_DEATH(object[std::size_t{0}], "mValueType == ArrayVal");
    EXPECT_DEATH(null["a"], "mValueType == ObjectVal");
    EXPECT_DEATH(text[std::string("a")], "mValueType == ObjectVal");
    EXPECT_DEATH((void)text.HasKey("a"), "mValueType == ObjectVal");
    EXPECT_DEATH((void)text.HasKeys({"a"}), "mValueType == ObjectVal");
    EXPECT_DEATH((void)text.HasKeys(keys, 1), "mValueType == ObjectVal");
    EXPECT_DEATH((void)static_cast<int>(text), "IsNumeric\\(\\)");
    EXPECT_DEATH((void)static_cast<unsigned>(text), "IsNumeric\\(\\)");
    EXPECT_DEATH((void)static_cast<float>(text), "IsNumeric\\(\\)");
    EXPECT_DEATH((void)static_cast<double>(text), "IsNumeric\\(\\)");
    EXPECT_DEATH((void)null.ToString(), "mValueType == StringVal");
    EXPECT_DEATH((void)text.ToObject(), "mValueType == ObjectVal");
    EXPECT_DEATH((void)text.ToArray(), "mValueType == ArrayVal");
    EXPECT_DEATH((void)text.ToBool(), "mValueType == BoolVal");
}
