// SPDX-License-Identifier: Apache-2.0
#include "json/json.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <limits>

namespace json {

namespace {

/// A misused value would go on with a made-up one, so the process ends, in every kind of build.
void Demand(bool condition, const char* text) {
    if (condition)
        return;
    std::fprintf(stderr, "json: Assertion `%s' failed.\n", text);
    std::abort();
}

/// The whole part, held at the ends of the integer's range; 0 for what is no number.
template <class Integer>
Integer Truncate(double value) {
    using Limits = std::numeric_limits<Integer>;
    if (value != value)
        return 0;
    if (value <= static_cast<double>(Limits::min()))
        return Limits::min();
    if (value >= static_cast<double>(Limits::max()))
        return Limits::max();
    return static_cast<Integer>(value);
}

float Narrow(double value) {
    constexpr double MAX = std::numeric_limits<float>::max();
    if (value > MAX)
        return std::numeric_limits<float>::infinity();
    if (value < -MAX)
        return -std::numeric_limits<float>::infinity();
    return static_cast<float>(value);
}

int BitsOf(unsigned int value) {
    int bits = 0;
    std::memcpy(&bits, &value, sizeof bits);
    return bits;
}

} // namespace

// ---- Array

Array::Array() = default;
Array::Array(const Array& other) = default;
Array::Array(Array&& other) noexcept = default;
Array::~Array() = default;
Array& Array::operator=(const Array& other) = default;

Value& Array::operator[](std::size_t index) {
    return mValues[index];
}
const Value& Array::operator[](std::size_t index) const {
    return mValues[index];
}

std::size_t Array::size() const {
    return mValues.size();
}
void Array::Clear() {
    mValues.clear();
}

Array::Values::iterator Array::begin() {
    return mValues.begin();
}
Array::Values::iterator Array::end() {
    return mValues.end();
}
Array::Values::const_iterator Array::begin() const {
    return mValues.begin();
}
Array::Values::const_iterator Array::end() const {
    return mValues.end();
}

void Array::push_back(const Value& value) {
    mValues.push_back(value);
}

void Array::insert(std::size_t index, const Value& value) {
    mValues.insert(mValues.begin() + static_cast<Values::difference_type>(index), value);
}

Array::Values::iterator Array::find(const Value& value) {
    return std::find(begin(), end(), value);
}
Array::Values::const_iterator Array::find(const Value& value) const {
    return std::find(begin(), end(), value);
}
bool Array::HasValue(const Value& value) const {
    return find(value) != end();
}

// ---- Object

Object::Object() = default;
Object::Object(const Object& other) = default;
Object::Object(Object&& other) noexcept = default;
Object::~Object() = default;
Object& Object::operator=(const Object& other) = default;

Value& Object::operator[](const std::string& key) {
    return mMembers[key];
}
Value& Object::operator[](const char* key) {
    return mMembers[key];
}
const Value& Object::operator[](const std::string& key) const {
    return mMembers.find(key)->second;
}
const Value& Object::operator[](const char* key) const {
    return mMembers.find(key)->second;
}

std::size_t Object::size() const {
    return mMembers.size();
}
void Object::Clear() {
    mMembers.clear();
}

Object::Members::iterator Object::begin() {
    return mMembers.begin();
}
Object::Members::iterator Object::end() {
    return mMembers.end();
}
Object::Members::const_iterator Object::begin() const {
    return mMembers.begin();
}
Object::Members::const_iterator Object::end() const {
    return mMembers.end();
}

Object::Members::iterator Object::find(const std::string& key) {
    return mMembers.find(key);
}
Object::Members::const_iterator Object::find(const std::string& key) const {
    return mMembers.find(key);
}

bool Object::HasKey(const std::string& key) const {
    return find(key) != end();
}

int Object::HasKeys(const std::vector<std::string>& keys) const {
    for (std::size_t i = 0; i < keys.size(); ++i) {
        if (!HasKey(keys[i]))
            return static_cast<int>(i);
    }
    return -1;
}

int Object::HasKeys(const char** keys, int count) const {
    for (int i = 0; i < count; ++i) {
        if (!HasKey(keys[i]))
            return i;
    }
    return -1;
}

// ---- Value

Value::Value(int value) {
    SetInt(value);
}
Value::Value(unsigned int value) {
    SetUInt(value);
}
Value::Value(float value) {
    SetFloat(value, static_cast<double>(value));
}
Value::Value(double value) {
    SetDouble(value);
}
Value::Value(bool value) : mValueType(BoolVal), mBoolVal(value) {}
Value::Value(const char* value) : mValueType(StringVal), mStringVal(value) {}
Value::Value(const std::string& value) : mValueType(StringVal), mStringVal(value) {}
Value::Value(const Object& value) : mValueType(ObjectVal), mObjectVal(value) {}
Value::Value(const Array& value) : mValueType(ArrayVal), mArrayVal(value) {}

Value::Value(const Value& other) {
    *this = other;
}

Value& Value::operator=(const Value& other) {
    if (this == &other)
        return *this;
    switch (other.mValueType) {
        case NULLVal:
            break;
        case StringVal:
            mStringVal = other.mStringVal;
            break;
        case IntVal:
            SetInt(other.mIntVal);
            break;
        case FloatVal:
            SetFloat(other.mFloatVal, other.mDoubleVal);
            break;
        case DoubleVal:
            SetDouble(other.mDoubleVal);
            break;
        case ObjectVal:
            mObjectVal = other.mObjectVal;
            break;
        case ArrayVal:
            mArrayVal = other.mArrayVal;
            break;
        case BoolVal:
            mBoolVal = other.mBoolVal;
            break;
        case UIntVal:
            SetUInt(other.mUIntVal);
            break;
    }
    mValueType = other.mValueType;
    return *this;
}

void Value::SetInt(int value) {
    mValueType = IntVal;
    mIntVal = value;
    mFloatVal = static_cast<float>(value);
    mDoubleVal = value;
    mUIntVal = static_cast<unsigned int>(value);
}

void Value::SetUInt(unsigned int value) {
    mValueType = UIntVal;
    mUIntVal = value;
    mIntVal = BitsOf(value);
    mFloatVal = static_cast<float>(value);
    mDoubleVal = value;
}

void Value::SetFloat(float value, double asDouble) {
    mValueType = FloatVal;
    mFloatVal = value;
    mDoubleVal = asDouble;
    mIntVal = Truncate<int>(static_cast<double>(value));
    mUIntVal = Truncate<unsigned int>(static_cast<double>(value));
}

void Value::SetDouble(double value) {
    mValueType = DoubleVal;
    mDoubleVal = value;
    mFloatVal = Narrow(value);
    mIntVal = Truncate<int>(value);
    mUIntVal = Truncate<unsigned int>(value);
}

bool Value::IsNumeric() const {
    return mValueType == IntVal || mValueType == FloatVal || mValueType == DoubleVal || mValueType == UIntVal;
}

std::size_t Value::size() const {
    if (mValueType == ObjectVal)
        return mObjectVal.size();
    if (mValueType == ArrayVal)
        return mArrayVal.size();
    return 1;
}

Value& Value::operator[](std::size_t index) {
    Demand(mValueType == ArrayVal, "mValueType == ArrayVal");
    return mArrayVal[index];
}

const Value& Value::operator[](std::size_t index) const {
    Demand(mValueType == ArrayVal, "mValueType == ArrayVal");
    return mArrayVal[index];
}

Value& Value::operator[](const std::string& key) {
    Demand(mValueType == ObjectVal, "mValueType == ObjectVal");
    return mObjectVal[key];
}

const Value& Value::operator[](const std::string& key) const {
    Demand(mValueType == ObjectVal, "mValueType == ObjectVal");
    return mObjectVal[key];
}

Value& Value::operator[](const char* key) {
    Demand(mValueType == ObjectVal, "mValueType == ObjectVal");
    return mObjectVal[key];
}

const Value& Value::operator[](const char* key) const {
    Demand(mValueType == ObjectVal, "mValueType == ObjectVal");
    return mObjectVal[key];
}

bool Value::HasKey(const std::string& key) const {
    Demand(mValueType == ObjectVal, "mValueType == ObjectVal");
    return mObjectVal.HasKey(key);
}

int Value::HasKeys(const std::vector<std::string>& keys) const {
    Demand(mValueType == ObjectVal, "mValueType == ObjectVal");
    return mObjectVal.HasKeys(keys);
}

int Value::HasKeys(const char** keys, int count) const {
    Demand(mValueType == ObjectVal, "mValueType == ObjectVal");
    return mObjectVal.HasKeys(keys, count);
}

Value::operator int() const {
    Demand(IsNumeric(), "IsNumeric()");
    return mIntVal;
}

Value::operator unsigned int() const {
    Demand(IsNumeric(), "IsNumeric()");
    return mUIntVal;
}

Value::operator float() const {
    Demand(IsNumeric(), "IsNumeric()");
    return mFloatVal;
}

Value::operator double() const {
    Demand(IsNumeric(), "IsNumeric()");
    return mDoubleVal;
}

Value::operator std::string() const {
    return ToString();
}

Value::operator Array() const {
    return ToArray();
}

bool Value::ToBool() const {
    Demand(mValueType == BoolVal, "mValueType == BoolVal");
    return mBoolVal;
}

std::string Value::ToString() const {
    Demand(mValueType == StringVal, "mValueType == StringVal");
    return mStringVal;
}

const Object& Value::ToObject() const {
    Demand(mValueType == ObjectVal, "mValueType == ObjectVal");
    return mObjectVal;
}

const Array& Value::ToArray() const {
    Demand(mValueType == ArrayVal, "mValueType == ArrayVal");
    return mArrayVal;
}

// ---- Equality

namespace {

bool EqualNumbers(const Value& a, const Value& b) {
    const ValueType ta = a.GetType();
    const ValueType tb = b.GetType();
    if (ta == FloatVal || tb == FloatVal)
        return static_cast<float>(a) == static_cast<float>(b);
    if (ta == DoubleVal || tb == DoubleVal)
        return static_cast<double>(a) == static_cast<double>(b);
    return static_cast<unsigned int>(a) == static_cast<unsigned int>(b);
}

bool EqualArrays(const Array& a, const Array& b) {
    return std::equal(a.begin(), a.end(), b.begin(), b.end());
}

bool EqualObjects(const Object& a, const Object& b) {
    return std::equal(a.begin(), a.end(), b.begin(), b.end(), [](const auto& x, const auto& y) {
        return x.first == y.first && x.second == y.second;
    });
}

} // namespace

bool operator==(const Value& a, const Value& b) {
    if (a.IsNumeric() && b.IsNumeric())
        return EqualNumbers(a, b);
    if (a.mValueType != b.mValueType)
        return false;
    switch (a.mValueType) {
        case StringVal:
            return a.mStringVal == b.mStringVal;
        case BoolVal:
            return a.mBoolVal == b.mBoolVal;
        case ArrayVal:
            return EqualArrays(a.mArrayVal, b.mArrayVal);
        case ObjectVal:
            return EqualObjects(a.mObjectVal, b.mObjectVal);
        default:
            return true;
    }
}

} // namespace json
