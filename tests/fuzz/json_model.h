// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "json/json.h"

#include <strings.h>

#include <cstddef>
#include <cstdlib>
#include <stack>
#include <string>

/// The reader once more, in its slowest and plainest form: each step cuts strings off strings, and walks them
/// character by character. What the product's reader makes of a text has to be what this one makes of it.
class JsonModel {
public:
    static json::Value Read(const std::string& text) {
        JsonModel model;
        return model.ReadDocument(text);
    }

private:
    static constexpr std::size_t NONE = std::string::npos;

    static bool IsSpace(char c) {
        return c == 0 || c == ' ' || c == '\t' || c == '\n' || c == '\v' || c == '\f' || c == '\r';
    }

    static std::string Trim(std::string s) {
        while (!s.empty() && IsSpace(s[0]))
            s = s.substr(1);
        while (!s.empty() && IsSpace(s[s.size() - 1]))
            s = s.substr(0, s.size() - 1);
        return s;
    }

    static std::size_t QuotePos(const std::string& s, std::size_t pos) {
        bool escaped = false;
        for (; pos < s.size(); ++pos) {
            if (s[pos] == '"' && !escaped)
                return pos;
            if (s[pos] == '\\' && !escaped)
                escaped = true;
            else
                escaped = false;
        }
        return NONE;
    }

    bool TopIs(json::StackDepthType type) const { return !m_stack.empty() && m_stack.top() == type; }

    /// Index of the bracket that ends the structure at the front; the length when there is none, NONE when a
    /// wrong one comes first.
    std::size_t EndOfStructure(const std::string& s) {
        if (s.size() < 2)
            return 1;
        const std::size_t depth = m_stack.size();
        bool inQuote = false;
        for (std::size_t i = 1; i < s.size(); ++i) {
            if (s[i] == '"' && s[i - 1] != '\\')
                inQuote = !inQuote;
            if (inQuote)
                continue;
            if (s[i] == '[')
                m_stack.push(json::InArray);
            if (s[i] == '{')
                m_stack.push(json::InObject);
            if (s[i] == ']' || s[i] == '}') {
                if (!TopIs(s[i] == ']' ? json::InArray : json::InObject))
                    return NONE;
                const bool isEnd = m_stack.size() == depth;
                m_stack.pop();
                if (isEnd)
                    return i;
            }
        }
        return s.size();
    }

    json::Value ReadValue(std::string& str, bool& failed) {
        failed = false;
        str = Trim(str);
        if (str.empty())
            return json::Value();
        if (str[0] == '"')
            return ReadString(str, failed);
        if (str[0] == '{' || str[0] == '[')
            return ReadStructure(str, failed);
        return ReadToken(str, failed);
    }

    static json::Value ReadString(std::string& str, bool& failed) {
        const std::size_t end = QuotePos(str, 1);
        if (end == NONE) {
            failed = true;
            return json::Value();
        }
        std::string plain;
        for (std::size_t i = 1; i < end; ++i) {
            if (str[i] != '\\' || i + 1 == end) {
                plain += str[i];
                continue;
            }
            ++i;
            const std::string known = "\"/\\bfnrt";
            const std::string meaning = "\"/\\\b\f\n\r\t";
            if (str[i] == 'u') {
                const std::string digits = str.substr(0, end).substr(i + 3, 2); // may throw, and has to
                plain += static_cast<char>(std::strtoul(digits.c_str(), nullptr, 16));
                i += 4;
            } else if (known.find(str[i]) != NONE) {
                plain += meaning[known.find(str[i])];
            }
        }
        str = str.substr(end + 1);
        return json::Value(Trim(plain));
    }

    json::Value ReadStructure(std::string& str, bool& failed) {
        const bool isObject = str[0] == '{';
        m_stack.push(isObject ? json::InObject : json::InArray);
        const std::size_t end = EndOfStructure(str);
        if (end == NONE || end + 1 > str.size()) {
            failed = true;
            return json::Value();
        }
        const std::string structure = str.substr(0, end + 1);
        str = str.substr(end + 1);
        if (m_depth == json::MAX_DEPTH)
            return json::Value();
        ++m_depth;
        const json::Value value = isObject ? ReadDocument(structure) : ReadArray(structure);
        --m_depth;
        return value;
    }

    json::Value ReadToken(std::string& str, bool& failed) {
        std::string token;
        bool isReal = false;
        std::size_t i = 0;
        for (; i < str.size() && str[i] != ','; ++i) {
            if (str[i] == '.' || str[i] == 'e')
                isReal = true;
            if (str[i] == '}' || str[i] == ']') {
                if (!TopIs(str[i] == '}' ? json::InObject : json::InArray)) {
                    failed = true;
                    return json::Value();
                }
                m_stack.pop();
            }
            if (!IsSpace(str[i]))
                token += str[i];
        }
        str = str.substr(i);
        return Classify(token, isReal);
    }

    static json::Value Classify(const std::string& token, bool isReal) {
        const char* const text = token.c_str();
        if (strcasecmp(text, "true") == 0)
            return json::Value(true);
        if (strcasecmp(text, "false") == 0)
            return json::Value(false);
        if (isReal)
            return json::Value(std::atof(text));
        if (strcasecmp(text, "null") == 0)
            return json::Value();
        const double d = std::atof(text);
        if (d >= -2147483648.0 && d <= 2147483647.0)
            return json::Value(static_cast<int>(std::strtol(text, nullptr, 10)));
        if (d >= 0 && d <= 4294967295.0)
            return json::Value(static_cast<unsigned>(std::strtol(text, nullptr, 10)));
        return json::Value(d);
    }

    json::Value ReadArray(std::string str) {
        str = Trim(str);
        if (str.size() < 2 || str[0] != '[' || str[str.size() - 1] != ']')
            return json::Value();
        str = str.substr(1, str.size() - 2);
        json::Array array;
        while (!str.empty()) {
            bool failed = false;
            const json::Value element = ReadElement(str, failed);
            if (failed)
                return json::Value();
            if (element.GetType() != json::NULLVal)
                array.push_back(element);
        }
        return json::Value(array);
    }

    json::Value ReadElement(std::string& str, bool& failed) {
        std::string element;
        for (std::size_t i = 0;; ++i) {
            const char c = str[i];
            if (c == '[' || c == '{')
                return ReadValue(str, failed);
            const bool isEnd = c == ',' || c == ']';
            if (!isEnd)
                element += c;
            if (isEnd || i + 1 == str.size()) {
                str = str.substr(i + 1);
                return ReadValue(element, failed);
            }
        }
    }

    json::Value ReadDocument(const std::string& str) {
        const std::string s = Trim(str);
        if (s.empty())
            return json::Value();
        const char last = s[s.size() - 1];
        if (s[0] == '[' && last == ']') {
            m_stack.push(json::InArray);
            const json::Value array = ReadArray(s);
            if (array.GetType() != json::NULLVal && TopIs(json::InArray))
                m_stack.pop();
            return array;
        }
        if (s[0] != '{' || last != '}')
            return json::Value();
        m_stack.push(json::InObject);
        return ReadMembers(s.substr(1, s.size() - 2));
    }

    json::Value ReadMembers(std::string rest) {
        json::Object object;
        while (!rest.empty()) {
            const std::size_t q1 = QuotePos(rest, 0);
            const std::size_t q2 = q1 == NONE ? NONE : QuotePos(rest, q1 + 1);
            const std::size_t colon = q2 == NONE ? NONE : rest.find(':', q2);
            if (colon == NONE || q2 == q1 + 1)
                return json::Value();
            const std::string key = rest.substr(q1 + 1, q2 - q1 - 1);
            rest = rest.substr(colon + 1);
            bool failed = false;
            object[key] = ReadValue(rest, failed);
            if (failed)
                return json::Value();
        }
        if (TopIs(json::InObject))
            m_stack.pop();
        return json::Value(object);
    }

    std::stack<json::StackDepthType> m_stack;
    int m_depth = 0;
};
