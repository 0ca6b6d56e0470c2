// SPDX-License-Identifier: Apache-2.0
#include "json/json.h"

#include <array>
#include <charconv>

namespace json {

namespace {

/// Six decimals, with a point whatever the host's locale says.
std::string WithSixDecimals(double value) {
    std::array<char, 500> digits;
    const auto end =
        std::to_chars(digits.data(), digits.data() + digits.size(), value, std::chars_format::fixed, 6).ptr;
    return std::string(digits.data(), end);
}

std::string SerializeArray(const Array& array);

std::string SerializeValue(const Value& value) {
    switch (value.GetType()) {
        case StringVal:
            return "\"" + value.ToString() + "\"";
        case IntVal:
            return std::to_string(static_cast<int>(value));
        case FloatVal:
            return WithSixDecimals(static_cast<double>(static_cast<float>(value)));
        case DoubleVal:
            return WithSixDecimals(static_cast<double>(value));
        case UIntVal:
            return std::to_string(static_cast<unsigned int>(value));
        case BoolVal:
            return value.ToBool() ? "true" : "false";
        case ObjectVal:
            return Serialize(value);
        case ArrayVal:
            return SerializeArray(value.ToArray());
        default:
            return "null";
    }
}

std::string SerializeArray(const Array& array) {
    std::string text = "[";
    const char* separator = "";
    for (const Value& element : array) {
        text += separator + SerializeValue(element);
        separator = ",";
    }
    return text + "]";
}

std::string SerializeObject(const Object& object) {
    std::string text = "{";
    const char* separator = "";
    for (const auto& [key, value] : object) {
        text += separator + ("\"" + key + "\":") + SerializeValue(value);
        separator = ",";
    }
    return text + "}";
}

} // namespace

std::string Serialize(const Value& value) {
    if (value.GetType() == ArrayVal)
        return SerializeArray(value.ToArray());
    if (value.GetType() == ObjectVal)
        return SerializeObject(value.ToObject());
    return "";
}

} // namespace json
