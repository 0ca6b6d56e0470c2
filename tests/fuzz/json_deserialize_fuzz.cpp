// SPDX-License-Identifier: Apache-2.0
#include "json/json.h"
#include "tests/fuzz/fuzz_check.h"
#include "tests/fuzz/json_model.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <string>

/// Any text at all: the reader ends, agrees with the plain model of itself, gives nothing that its rules rule
/// out, and what the writer makes of the result is read back as the contract promises.

namespace {

using json::Value;

/// The model copies the rest of the text at each step.
constexpr std::size_t LONGEST_FOR_THE_MODEL = 1 << 14;

/// The reader copies a structure once for each level above it: deeper ones are not read more often than
/// needed.
constexpr int DEEPEST_FOR_ALL_READINGS = 32;

bool IsStructure(const Value& value) {
    return value.GetType() == json::ArrayVal || value.GetType() == json::ObjectVal;
}

bool IsTrimmed(const std::string& text) {
    const std::string space("\0 \t\n\v\f\r", 7);
    return text.empty() || (space.find(text.front()) == space.npos && space.find(text.back()) == space.npos);
}

/// What every value that was read obeys.
void RequireReadable(const Value& value, int depth) {
    Require(value.GetType() != json::FloatVal, "the reader makes no single precision numbers");
    if (value.GetType() == json::StringVal)
        Require(IsTrimmed(value.ToString()), "strings are trimmed");
    if (!IsStructure(value))
        return;
    Require(depth <= json::MAX_DEPTH, "no structure lies deeper than the limit");
    if (value.GetType() == json::ArrayVal) {
        for (const Value& element : value.ToArray()) {
            Require(element.GetType() != json::NULLVal, "arrays keep no nulls");
            RequireReadable(element, depth + 1);
        }
        return;
    }
    for (const auto& member : value.ToObject()) {
        Require(!member.first.empty(), "no key is empty");
        RequireReadable(member.second, depth + 1);
    }
}

/// Nothing that the writer would have to escape.
bool IsPlainText(const std::string& text) {
    return text.find_first_of("\"\\") == text.npos;
}

/// Whether the writer's text of it means the same to the reader. In an array the reader knows no quotes, so
/// strings there may hold nothing that ends an element.
bool SurvivesWriting(const Value& value) {
    switch (value.GetType()) {
        case json::StringVal:
            return IsPlainText(value.ToString());
        case json::ArrayVal:
            return std::all_of(value.ToArray().begin(), value.ToArray().end(), [](const Value& element) {
                return SurvivesWriting(element) &&
                       (element.GetType() != json::StringVal ||
                        element.ToString().find_first_of("[{,]") == std::string::npos);
            });
        case json::ObjectVal:
            return std::all_of(value.ToObject().begin(), value.ToObject().end(), [](const auto& member) {
                return IsPlainText(member.first) && SurvivesWriting(member.second);
            });
        default:
            return true;
    }
}

double RoundedToSixDecimals(double value) {
    std::array<char, 400> text;
    std::snprintf(text.data(), text.size(), "%f", value);
    return std::strtod(text.data(), nullptr);
}

/// The value after writing has cut its real numbers to six decimals.
Value Rounded(const Value& value) {
    if (value.GetType() == json::DoubleVal)
        return Value(RoundedToSixDecimals(static_cast<double>(value)));
    if (value.GetType() == json::ArrayVal) {
        json::Array array;
        for (const Value& element : value.ToArray())
            array.push_back(Rounded(element));
        return Value(array);
    }
    if (value.GetType() == json::ObjectVal) {
        json::Object object;
        for (const auto& member : value.ToObject())
            object[member.first] = Rounded(member.second);
        return Value(object);
    }
    return value;
}

int DepthOf(const Value& value) {
    int below = 0;
    if (value.GetType() == json::ArrayVal) {
        for (const Value& element : value.ToArray())
            below = std::max(below, DepthOf(element));
    }
    if (value.GetType() == json::ObjectVal) {
        for (const auto& member : value.ToObject())
            below = std::max(below, DepthOf(member.second));
    }
    return IsStructure(value) ? below + 1 : 0;
}

void RequireTheModelsReading(const std::string& text, const Reading& reading) {
    if (text.size() > LONGEST_FOR_THE_MODEL)
        return;
    const Reading expected = ReadWith(JsonModel::Read, text);
    Require(reading.hasThrown == expected.hasThrown, "the reader throws where its model does");
    Require(IsSame(reading.value, expected.value), "the reader gives what its model gives");
}

void RequireNoEffectOfSpaceAround(const std::string& text, const Reading& reading) {
    const Reading spaced = ReadWith(json::Deserialize, std::string("\0 \n", 3) + text + "\t\r");
    Require(spaced.hasThrown == reading.hasThrown && IsSame(spaced.value, reading.value),
            "space around a document changes nothing");
}

void RequireWritingToRoundTrip(const Value& value) {
    const std::string written = json::Serialize(value);
    const Value expected = Rounded(value);
    const Value again = json::Deserialize(written);
    Require(IsSame(again, expected), "what was written is read back, its real numbers rounded");
    Require(json::Serialize(again) == written, "a text of the writer is written again as it was");
    if (DepthOf(value) > DEEPEST_FOR_ALL_READINGS)
        return;
    const Value element = json::Deserialize("[" + written + "]");
    Require(element.size() == 1 && IsSame(element[std::size_t{0}], expected),
            "a text of the writer may stand in an array");
    const Value member = json::Deserialize("{\"k\":" + written + "}");
    Require(member.size() == 1 && IsSame(member["k"], expected),
            "a text of the writer may stand in an object");
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string text(data, data + size);
    const Reading reading = ReadWith(json::Deserialize, text);
    RequireTheModelsReading(text, reading);
    if (DepthOf(reading.value) <= DEEPEST_FOR_ALL_READINGS)
        RequireNoEffectOfSpaceAround(text, reading);
    if (reading.hasThrown)
        return 0;

    const Value& value = reading.value;
    Require(value.GetType() == json::NULLVal || IsStructure(value), "only a structure is a document");
    RequireReadable(value, 0);
    // Copies are equal; a text that breaks the writer's promise still has to be written.
    Require(IsSame(Value(value), value), "a copy is the same");
    Require(json::Serialize(value).empty() != IsStructure(value),
            "a structure, and nothing else, has a text");
    if (IsStructure(value) && SurvivesWriting(value))
        RequireWritingToRoundTrip(value);
    return 0;
}
