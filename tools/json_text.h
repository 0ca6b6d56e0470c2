// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>
#include <vector>

/// Writes strict JSON for other programs to read. The module in json/ is for the debug file: it escapes
/// nothing, and titles of windows are anybody's.

class JsonObjectText {
public:
    /// `value` is UTF-8.
    JsonObjectText& String(std::string_view name, std::string_view value);
    /// What is no number at all becomes null.
    JsonObjectText& Number(std::string_view name, double value);
    JsonObjectText& Bool(std::string_view name, bool value);
    JsonObjectText& Null(std::string_view name);
    JsonObjectText& Object(std::string_view name, const JsonObjectText& value);
    /// What JsonArrayText gave.
    JsonObjectText& Array(std::string_view name, std::string_view arrayText);
    /// All members of another one.
    JsonObjectText& MembersOf(const JsonObjectText& other);

    bool operator==(const JsonObjectText&) const = default;
    std::string Text() const { return "{" + m_members + "}"; }

private:
    JsonObjectText& Add(std::string_view name, std::string_view valueText);
    JsonObjectText& Join(std::string_view members);

    std::string m_members;
};

/// An element a line.
std::string JsonArrayText(const std::vector<std::string>& elements);

/// With its quotes.
std::string JsonStringText(std::string_view text);
