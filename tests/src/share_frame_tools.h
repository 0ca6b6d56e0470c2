// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/share_frame.h"

#include <cstddef>
#include <memory>
#include <utility>
#include <vector>

struct ReleaseReference {
    template <class Object>
    void operator()(Object* object) const {
        object->Release();
    }
};

/// The first reference to an object that lives by a reference count.
template <class Object = CShareFrame>
using Held = std::unique_ptr<Object, ReleaseReference>;

template <class Object = CShareFrame, class... Arguments>
Held<Object> NewFrame(Arguments&&... arguments) {
    auto* object = new Object(std::forward<Arguments>(arguments)...);
    object->AddRef();
    return Held<Object>(object);
}

inline Held<> NewFrame(int width, int height, SHARE_FRAME_FORMAT format) {
    auto frame = NewFrame<>();
    frame->SetFrameSize(width, height);
    frame->SetFrameDataFormat(format);
    return frame;
}

using Bytes = std::vector<unsigned char>;

/// Bytes of which neighbours, and any two blocks with different seeds, differ.
inline Bytes Pattern(std::size_t size, std::size_t seed = 1) {
    Bytes bytes(size);
    for (std::size_t i = 0; i < size; ++i)
        bytes[i] = static_cast<unsigned char>(seed * 37 + i * 7 + (i >> 8));
    return bytes;
}

inline int Length(const Bytes& bytes) {
    return static_cast<int>(bytes.size());
}

/// A part of some bytes; empty where it is out of range.
inline Bytes Part(const Bytes& bytes, std::size_t from, std::size_t count) {
    if (from + count > bytes.size())
        return {};
    const auto begin = bytes.begin() + static_cast<std::ptrdiff_t>(from);
    return {begin, begin + static_cast<std::ptrdiff_t>(count)};
}

/// The first bytes of a frame's memory; `count` must not be above its capacity.
inline Bytes FirstBytes(IShareFrame& frame, std::size_t count) {
    const unsigned char* data = frame.GetFrameData();
    return data != nullptr ? Bytes(data, data + count) : Bytes();
}

/// How many bytes a frame with a picture and memory lets its reader have: its capacity, if below a million.
inline int CapacityOf(IShareFrame& frame) {
    constexpr int LIMIT = 1'000'000;
    Bytes low(LIMIT, 0x00);
    Bytes high(LIMIT, 0xFF);
    if (frame.ReadFrameData(low.data(), LIMIT) != LIMIT || frame.ReadFrameData(high.data(), LIMIT) != LIMIT)
        return -1;
    std::size_t count = 0;
    while (count < LIMIT && low[count] == high[count])
        ++count;
    return static_cast<int>(count);
}
