// SPDX-License-Identifier: Apache-2.0
#include "json/json.h"

#include <algorithm>
#include <clocale>
#include <cstdlib>
#include <optional>
#include <stack>
#include <string_view>

namespace json {

namespace {

using Text = std::string_view;

/// What a parse knows besides the text. Quirks of the reader rest on the stack's exact state, so it is pushed
/// and popped just where the rules say, also on the way out of a failure.
struct Parse {
    std::stack<StackDepthType> stack;
    int depth = 0;

    bool IsTop(StackDepthType type) const { return !stack.empty() && stack.top() == type; }
};

Value DeserializeValue(Text& str, bool& had_error, Parse& parse);

/// A zero byte counts as white space.
bool json_isspace(char c) {
    return c == '\0' || c == ' ' || (c >= '\t' && c <= '\r');
}

Text Trim(Text s) {
    while (!s.empty() && json_isspace(s.front()))
        s.remove_prefix(1);
    while (!s.empty() && json_isspace(s.back()))
        s.remove_suffix(1);
    return s;
}

/// The first double quote at or after `pos` that no odd run of backslashes escapes.
std::size_t GetQuotePos(Text s, std::size_t pos) {
    bool escaped = false;
    for (std::size_t i = pos; i < s.size(); ++i) {
        if (s[i] == '"' && !escaped)
            return i;
        escaped = s[i] == '\\' && !escaped;
    }
    return Text::npos;
}

constexpr std::size_t WRONG_BRACKET = Text::npos;

/// The bracket that closes the structure at the front of `s`, whose entry is on the stack already; the length
/// of `s` when there is none, WRONG_BRACKET when another kind of bracket closes first. A string that ends in
/// an escaped backslash counts as not ended.
std::size_t GetEndOfArrayOrObj(Text s, std::stack<StackDepthType>& stack) {
    if (s.size() < 2)
        return 1;
    const std::size_t depth = stack.size();
    bool inQuote = false;
    for (std::size_t i = 1; i < s.size(); ++i) {
        const char c = s[i];
        if (c == '"' && s[i - 1] != '\\')
            inQuote = !inQuote;
        if (inQuote)
            continue;
        if (c == '[')
            stack.push(InArray);
        if (c == '{')
            stack.push(InObject);
        if (c != ']' && c != '}')
            continue;
        if (stack.empty() || stack.top() != (c == ']' ? InArray : InObject))
            return WRONG_BRACKET;
        const bool isOurs = stack.size() == depth;
        stack.pop();
        if (isOurs)
            return i;
    }
    return s.size();
}

/// The byte of a \u escape whose backslash stands at `backslash`: its last two digits; the first two are
/// dropped.
char ReadHexByte(const std::string& quoted, std::size_t backslash) {
    const std::string digits = quoted.substr(backslash + 4, 2);
    return static_cast<char>(std::strtoul(digits.c_str(), nullptr, 16));
}

/// What an escaped character stands for; nothing for one that is dropped together with its backslash.
std::optional<char> EscapedCharacter(char c) {
    switch (c) {
        case '"':
        case '/':
        case '\\':
            return c;
        case 'b':
            return '\b';
        case 'f':
            return '\f';
        case 'n':
            return '\n';
        case 'r':
            return '\r';
        case 't':
            return '\t';
        default:
            return std::nullopt;
    }
}

std::string Unescape(const std::string& quoted) {
    std::string plain;
    for (std::size_t i = 0; i < quoted.size(); ++i) {
        if (quoted[i] != '\\' || i + 1 == quoted.size()) {
            plain += quoted[i];
            continue;
        }
        if (quoted[i + 1] == 'u') {
            plain += ReadHexByte(quoted, i);
            i += 5;
            continue;
        }
        if (const std::optional<char> c = EscapedCharacter(quoted[i + 1]))
            plain += *c;
        ++i;
    }
    return plain;
}

Value DeserializeString(Text& str, bool& had_error) {
    const std::size_t end = GetQuotePos(str, 1);
    if (end == Text::npos) {
        had_error = true;
        return Value();
    }
    const std::string plain = Unescape(std::string(str.substr(1, end - 1)));
    str.remove_prefix(end + 1);
    return Value(std::string(Trim(plain)));
}

/// Numbers have a point whatever the host's locale says.
double ToDouble(const std::string& token) {
    static const locale_t plainLocale = newlocale(LC_ALL_MASK, "C", nullptr);
    if (plainLocale == nullptr)
        return std::strtod(token.c_str(), nullptr);
    return strtod_l(token.c_str(), nullptr, plainLocale);
}

long ToLong(const std::string& token) {
    return std::strtol(token.c_str(), nullptr, 10);
}

Value ClassifyNumber(const std::string& token) {
    const double d = ToDouble(token);
    if (d >= -2147483648.0 && d <= 2147483647.0)
        return Value(static_cast<int>(ToLong(token)));
    if (d >= 0 && d <= 4294967295.0)
        return Value(static_cast<unsigned int>(ToLong(token)));
    return Value(d);
}

/// `word` is in lower case; other letters than ASCII ones have no case.
bool IsWord(Text token, Text word) {
    const auto isSame = [](char a, char b) { return a == b || (a >= 'A' && a <= 'Z' && a - 'A' + 'a' == b); };
    return std::equal(token.begin(), token.end(), word.begin(), word.end(), isSame);
}

Value ClassifyToken(const std::string& token, bool isReal) {
    if (IsWord(token, "true"))
        return Value(true);
    if (IsWord(token, "false"))
        return Value(false);
    if (isReal)
        return Value(ToDouble(token));
    if (IsWord(token, "null"))
        return Value();
    return ClassifyNumber(token);
}

/// Runs up to the first comma or to the end. A closing bracket belongs to the token if it closes what the
/// stack says.
Value DeserializeToken(Text& str, bool& had_error, Parse& parse) {
    std::string token;
    bool isReal = false;
    std::size_t i = 0;
    for (; i < str.size() && str[i] != ','; ++i) {
        const char c = str[i];
        if (c == '.' || c == 'e')
            isReal = true;
        if (c == '}' || c == ']') {
            if (!parse.IsTop(c == '}' ? InObject : InArray)) {
                had_error = true;
                return Value();
            }
            parse.stack.pop();
        }
        if (!json_isspace(c))
            token += c;
    }
    str.remove_prefix(i);
    return ClassifyToken(token, isReal);
}

Value DeserializeArray(Text str, Parse& parse) {
    str = Trim(str);
    if (str.empty() || str.front() != '[' || str.back() != ']')
        return Value();
    if (str.size() < 2)
        return Value();
    str = str.substr(1, str.size() - 2);

    Array array;
    const auto append = [&array](const Value& element) {
        if (element.GetType() != NULLVal)
            array.push_back(element);
    };
    // Knows no quotes: a comma or a bracket inside a string ends the element there.
    while (!str.empty()) {
        bool had_error = false;
        const std::size_t i = str.find_first_of("[{,]");
        if (i != Text::npos && (str[i] == '[' || str[i] == '{')) {
            append(DeserializeValue(str, had_error, parse));
        } else {
            Text element = str.substr(0, i);
            append(DeserializeValue(element, had_error, parse));
            str.remove_prefix(i == Text::npos ? str.size() : i + 1);
        }
        if (had_error)
            return Value();
    }
    return Value(array);
}

/// One member from the front of `rest`; false when the object fails. Text before the key's quote is skipped
/// unseen.
bool DeserializeMember(Text& rest, Object& object, Parse& parse) {
    const std::size_t q1 = GetQuotePos(rest, 0);
    if (q1 == Text::npos)
        return false;
    const std::size_t q2 = GetQuotePos(rest, q1 + 1);
    if (q2 == Text::npos)
        return false;
    const std::size_t colon = rest.find(':', q2);
    if (colon == Text::npos)
        return false;
    const std::string key(rest.substr(q1 + 1, q2 - q1 - 1));
    if (key.empty())
        return false;
    rest.remove_prefix(colon + 1);
    bool had_error = false;
    Value& entry = object[key];
    entry = DeserializeValue(rest, had_error, parse);
    return !had_error;
}

Value DeserializeObject(Text body, Parse& parse) {
    Object object;
    while (!body.empty()) {
        if (!DeserializeMember(body, object, parse))
            return Value();
    }
    if (parse.IsTop(InObject))
        parse.stack.pop();
    return Value(object);
}

Value DeserializeInternal(Text str, Parse& parse) {
    const Text s = Trim(str);
    if (s.size() < 2)
        return Value();
    if (s.front() == '[') {
        if (s.back() != ']')
            return Value();
        parse.stack.push(InArray);
        Value array = DeserializeArray(s, parse);
        if (array.GetType() != NULLVal && parse.IsTop(InArray))
            parse.stack.pop();
        return array;
    }
    if (s.front() != '{' || s.back() != '}')
        return Value();
    parse.stack.push(InObject);
    return DeserializeObject(s.substr(1, s.size() - 2), parse);
}

Value DeserializeStructure(Text& str, bool& had_error, Parse& parse) {
    const bool isObject = str.front() == '{';
    parse.stack.push(isObject ? InObject : InArray);
    const std::size_t end = GetEndOfArrayOrObj(str, parse.stack);
    if (end == WRONG_BRACKET || end + 1 > str.size()) {
        had_error = true;
        return Value();
    }
    const Text structure = str.substr(0, end + 1);
    str.remove_prefix(end + 1);
    if (parse.depth >= MAX_DEPTH)
        return Value();
    ++parse.depth;
    Value value = isObject ? DeserializeInternal(structure, parse) : DeserializeArray(structure, parse);
    --parse.depth;
    return value;
}

/// Takes one value from the front of `str` and leaves what follows it.
Value DeserializeValue(Text& str, bool& had_error, Parse& parse) {
    had_error = false;
    str = Trim(str);
    if (str.empty())
        return Value();
    switch (str.front()) {
        case '"':
            return DeserializeString(str, had_error);
        case '{':
        case '[':
            return DeserializeStructure(str, had_error, parse);
        default:
            return DeserializeToken(str, had_error, parse);
    }
}

} // namespace

Value Deserialize(const std::string& text) {
    Parse parse;
    return DeserializeInternal(text, parse);
}

} // namespace json
