// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "json/json.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <string>

/// What the fuzzers share: a finding, and values compared more strictly than operator== does it.

inline void Require(bool condition, const char* claim) {
    if (condition)
        return;
    std::fprintf(stderr, "does not hold: %s\n", claim);
    std::abort();
}

/// What a reader made of a text.
struct Reading {
    bool hasThrown = false;
    json::Value value;
};

template <class Reader>
Reading ReadWith(Reader reader, const std::string& text) {
    Reading reading;
    try {
        reading.value = reader(text);
    } catch (const std::exception&) {
        reading.hasThrown = true;
    }
    return reading;
}

/// A number that is none equals itself here, and the two zeros differ.
inline bool IsSameDouble(double a, double b) {
    if (std::isnan(a) || std::isnan(b))
        return std::isnan(a) && std::isnan(b);
    return a == b && std::signbit(a) == std::signbit(b);
}

inline bool IsSameNumber(const json::Value& a, const json::Value& b) {
    return static_cast<int>(a) == static_cast<int>(b) &&
           static_cast<unsigned>(a) == static_cast<unsigned>(b) &&
           IsSameDouble(static_cast<double>(a), static_cast<double>(b)) &&
           IsSameDouble(static_cast<double>(static_cast<float>(a)),
                        static_cast<double>(static_cast<float>(b)));
}

/// Same types, same content, all the way down.
inline bool IsSame(const json::Value& a, const json::Value& b) {
    if (a.GetType() != b.GetType())
        return false;
    switch (a.GetType()) {
        case json::NULLVal:
            return true;
        case json::StringVal:
            return a.ToString() == b.ToString();
        case json::BoolVal:
            return a.ToBool() == b.ToBool();
        case json::ArrayVal:
            return std::equal(a.ToArray().begin(), a.ToArray().end(), b.ToArray().begin(), b.ToArray().end(),
                              IsSame);
        case json::ObjectVal:
            return std::equal(a.ToObject().begin(), a.ToObject().end(), b.ToObject().begin(),
                              b.ToObject().end(), [](const auto& x, const auto& y) {
                                  return x.first == y.first && IsSame(x.second, y.second);
                              });
        default:
            return IsSameNumber(a, b);
    }
}
