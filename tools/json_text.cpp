// SPDX-License-Identifier: Apache-2.0
#include "tools/json_text.h"

#include <array>
#include <cmath>
#include <cstddef>
#include <cstdio>

JsonObjectText& JsonObjectText::String(std::string_view name, std::string_view value) {
    return Add(name, JsonStringText(value));
}

JsonObjectText& JsonObjectText::Number(std::string_view name, double value) {
    std::array<char, 40> text{};
    std::snprintf(text.data(), text.size(), "%.10g", value);
    return Add(name, std::isfinite(value) ? text.data() : "null");
}

JsonObjectText& JsonObjectText::Bool(std::string_view name, bool value) {
    return Add(name, value ? "true" : "false");
}

JsonObjectText& JsonObjectText::Null(std::string_view name) {
    return Add(name, "null");
}

JsonObjectText& JsonObjectText::Object(std::string_view name, const JsonObjectText& value) {
    return Add(name, value.Text());
}

JsonObjectText& JsonObjectText::Array(std::string_view name, std::string_view arrayText) {
    const std::size_t end = arrayText.find_last_not_of('\n');
    return Add(name, arrayText.substr(0, end + 1));
}

JsonObjectText& JsonObjectText::Add(std::string_view name, std::string_view valueText) {
    return Join(JsonStringText(name) + ": " + std::string(valueText));
}

JsonObjectText& JsonObjectText::MembersOf(const JsonObjectText& other) {
    return Join(other.m_members);
}

JsonObjectText& JsonObjectText::Join(std::string_view members) {
    if (!m_members.empty() && !members.empty())
        m_members += ", ";
    m_members += members;
    return *this;
}

std::string JsonArrayText(const std::vector<std::string>& elements) {
    std::string text = "[";
    for (std::size_t i = 0; i < elements.size(); ++i)
        text += (i == 0 ? "\n  " : ",\n  ") + elements[i];
    return text + (elements.empty() ? "]\n" : "\n]\n");
}

std::string JsonStringText(std::string_view text) {
    std::string quoted = "\"";
    for (const char c : text) {
        if (c == '"' || c == '\\') {
            quoted += '\\';
            quoted += c;
        } else if (static_cast<unsigned char>(c) < 0x20) {
            std::array<char, 8> escape{};
            std::snprintf(escape.data(), escape.size(), "\\u%04x", static_cast<unsigned>(c));
            quoted += escape.data();
        } else {
            quoted += c;
        }
    }
    return quoted + '"';
}
