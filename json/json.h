// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <map>
#include <string>
#include <vector>

/// A small reader and writer for the debug file.
///
/// The reader is lenient, and not to be made to conform: it forgives stray text between members, drops white
/// space inside numbers and around strings, and knows no Unicode. What it makes of odd texts is its contract;
/// json/README.md tells the rules.
///
/// Threads:  no state of its own; a value belongs to one thread at a time.
/// Errors:   a text that can't be read gives the null value. Misuse of a value (asking a string for a
///           number) is a programming error and ends the process, in every kind of build.
namespace json {

enum ValueType {
    NULLVal = 0,
    StringVal = 1,
    IntVal = 2,
    FloatVal = 3,
    DoubleVal = 4,
    ObjectVal = 5,
    ArrayVal = 6,
    BoolVal = 7,
    UIntVal = 8,
};

/// What the reader is inside of.
enum StackDepthType {
    InObject = 0,
    InArray = 1,
};

class Value;

/// A list of values.
class Array {
public:
    using Values = std::vector<Value>;

    Array();
    Array(const Array& other);
    Array(Array&& other) noexcept;
    ~Array();
    Array& operator=(const Array& other);

    /// Not checked: `index` is below size().
    Value& operator[](std::size_t index);
    const Value& operator[](std::size_t index) const;

    std::size_t size() const;
    void Clear();

    Values::iterator begin();
    Values::iterator end();
    Values::const_iterator begin() const;
    Values::const_iterator end() const;

    void push_back(const Value& value);
    /// Puts it before `index`, which is at most size().
    void insert(std::size_t index, const Value& value);

    /// The first element that is equal, or end().
    Values::iterator find(const Value& value);
    Values::const_iterator find(const Value& value) const;
    bool HasValue(const Value& value) const;

private:
    Values mValues;
};

/// Values by key, in the order of the keys' bytes.
class Object {
public:
    using Members = std::map<std::string, Value>;

    Object();
    Object(const Object& other);
    Object(Object&& other) noexcept;
    ~Object();
    Object& operator=(const Object& other);

    /// Makes a null value for a key that is absent.
    Value& operator[](const std::string& key);
    Value& operator[](const char* key);
    /// Not checked: the key is there.
    const Value& operator[](const std::string& key) const;
    const Value& operator[](const char* key) const;

    std::size_t size() const;
    void Clear();

    Members::iterator begin();
    Members::iterator end();
    Members::const_iterator begin() const;
    Members::const_iterator end() const;

    Members::iterator find(const std::string& key);
    Members::const_iterator find(const std::string& key) const;

    bool HasKey(const std::string& key) const;
    /// Index of the first key that is missing, -1 when none is.
    int HasKeys(const std::vector<std::string>& keys) const;
    int HasKeys(const char** keys, int count) const;

private:
    Members mMembers;
};

/// One value of any type. A number keeps all four numeric views filled, so it can be asked for each; a view
/// that the number doesn't fit is held at the end of its range.
class Value {
public:
    Value() = default;
    Value(int value);
    Value(unsigned int value);
    Value(float value);
    Value(double value);
    Value(bool value);
    Value(const char* value);
    Value(const std::string& value);
    Value(const Object& value);
    Value(const Array& value);

    /// Copies what the type says and nothing else.
    Value(const Value& other);
    Value(Value&& other) noexcept = default;
    Value& operator=(const Value& other);
    ~Value() = default;

    ValueType GetType() const { return mValueType; }
    bool IsNumeric() const;

    /// Makes it null.
    void Clear() { mValueType = NULLVal; }

    /// Members of an object, elements of an array, 1 for everything else.
    std::size_t size() const;

    Value& operator[](std::size_t index);
    const Value& operator[](std::size_t index) const;
    Value& operator[](const std::string& key);
    const Value& operator[](const std::string& key) const;
    Value& operator[](const char* key);
    const Value& operator[](const char* key) const;

    bool HasKey(const std::string& key) const;
    int HasKeys(const std::vector<std::string>& keys) const;
    int HasKeys(const char** keys, int count) const;

    operator int() const;
    operator unsigned int() const;
    operator float() const;
    operator double() const;
    operator std::string() const;
    operator Array() const;

    bool ToBool() const;
    std::string ToString() const;
    const Object& ToObject() const;
    const Array& ToArray() const;

private:
    friend bool operator==(const Value& a, const Value& b);

    void SetInt(int value);
    void SetUInt(unsigned int value);
    void SetFloat(float value, double asDouble);
    void SetDouble(double value);

    ValueType mValueType = NULLVal;
    int mIntVal = 0;
    float mFloatVal = 0;
    double mDoubleVal = 0;
    std::string mStringVal;
    Object mObjectVal;
    Array mArrayVal;
    bool mBoolVal = false;
    unsigned int mUIntVal = 0;
};

/// Numbers of different types are compared in the narrower floating type of the two; an int and an unsigned
/// int by their bits.
bool operator==(const Value& a, const Value& b);

/// Writes an object or an array without white space; the empty string for everything else. Nothing is
/// escaped.
std::string Serialize(const Value& value);

/// Structures nested deeper than this read as the null value.
inline constexpr int MAX_DEPTH = 256;

/// Reads an object or an array; the null value for everything else. Throws std::out_of_range for a \u escape
/// that the string ends in the midst of.
Value Deserialize(const std::string& text);

} // namespace json
