// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/src/share_frame_tools.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <utility>
#include <vector>

/// Memory of a client, twice: as the frame under test sees it and as the model of that frame does.
struct ModelArena {
    Bytes real;
    Bytes model;
};

/// What a frame makes of its four figures. A value, so that it can be asked before a frame is told.
struct ModelGeometry {
    int width = 0;
    int height = 0;
    int explicitLine = 0;
    int format = 0;

    static int Wrapped(std::int64_t product) { return static_cast<int>(static_cast<std::uint32_t>(product)); }

    int LineBytes() const {
        if (format == 0)
            return 0;
        const int bytesPerPixel = format % 3 == 0 ? 3 : 4;
        return explicitLine != 0 ? explicitLine : Wrapped(std::int64_t{width} * bytesPerPixel);
    }
    int DataLen() const { return Wrapped(std::int64_t{LineBytes()} * height); }
    bool Empty() const { return width < 1 || height < 1; }

    bool Accepts(int line) const { return line >= 1 && line >= Wrapped(std::int64_t{3} * width); }
    ModelGeometry Sized(int w, int h) const { return {std::max(w, 0), std::max(h, 0), explicitLine, format}; }
    ModelGeometry Lined(int line) const {
        return {width, height, Accepts(line) ? line : explicitLine, format};
    }
    ModelGeometry Formatted(int f) const {
        return {width, height, explicitLine, f >= 0 && f <= 6 ? f : format};
    }
};

/// What a frame has to do, said as simply as can be. Slow, and sure of every index.
class CModelFrame {
public:
    const ModelGeometry& Geometry() const { return m_geometry; }
    int Capacity() const { return m_capacity; }
    bool Attached() const { return m_arena != nullptr; }
    unsigned Timestamp() const { return m_timestamp; }
    const IShareFrame::MetaInfo& Meta() const { return m_meta; }
    void SetTimestamp(unsigned timestamp) { m_timestamp = timestamp; }
    void SetMeta(const IShareFrame::MetaInfo& meta) { m_meta = meta; }
    void Reset() { m_geometry.explicitLine = 0; }

    /// The bytes that there are; null without memory.
    Bytes* Memory() { return m_arena != nullptr ? &m_arena->model : m_own.empty() ? nullptr : &m_own; }
    /// The bytes that a reader may have; less than the memory where less of an arena was attached.
    std::size_t Readable() { return Memory() != nullptr ? static_cast<std::size_t>(m_capacity) : 0; }

    void Apply(const ModelGeometry& geometry) {
        m_geometry = geometry;
        const int needed = geometry.DataLen();
        if (needed <= m_capacity || Attached())
            return;
        m_own.assign(static_cast<std::size_t>(needed), 0);
        m_capacity = needed;
    }

    int SetLine(int line) {
        if (!m_geometry.Accepts(line))
            return -1;
        Apply(m_geometry.Lined(line));
        return 0;
    }

    void Detach() {
        m_arena = nullptr;
        Apply(m_geometry);
    }
    /// A null arena takes the frame's own memory away and leaves `len` as its capacity.
    void Attach(ModelArena* arena, int len) {
        m_own.clear();
        m_arena = arena;
        m_capacity = len;
    }

    int Write(const Bytes& data, int len) {
        if (m_geometry.Empty() || Memory() == nullptr || len < 0 || len > m_geometry.DataLen())
            return 0;
        if (!Attached() && len > m_capacity)
            return 0;
        for (int i = 0; i < len; ++i)
            (*Memory()).at(At(i)) = data.at(At(i));
        return len;
    }

    int Read(Bytes& data, int len) {
        if (m_geometry.Empty() || Memory() == nullptr || len < 0)
            return 0;
        for (int i = 0; i < std::min(len, m_capacity); ++i)
            data.at(At(i)) = Memory()->at(At(i));
        return len;
    }

    /// Moves byte by byte; `part` becomes whether bytes moved although the answer is 0.
    int MoveArea(const TVLRect& rect, Bytes& data, int len, bool read, bool& part) {
        part = false;
        const std::int64_t line = m_geometry.LineBytes();
        if (m_geometry.Empty() || Memory() == nullptr || len < 0 || !Inside(rect) || line < 1)
            return 0;
        const std::int64_t pixel = line / m_geometry.width;
        const std::int64_t row = pixel * (rect.right - rect.left);
        if (row > len || row == 0)
            return 0;
        std::int64_t moved = 0;
        bool complete = true;
        for (std::int64_t y = rect.top; complete && y < rect.bottom; ++y) {
            const std::int64_t first = y * line + pixel * rect.left;
            complete = first + row <= m_capacity;
            for (std::int64_t i = 0; complete && i < row; ++i, ++moved) {
                unsigned char& inFrame = Memory()->at(At(first + i));
                unsigned char& inData = data.at(At(moved));
                (read ? inData : inFrame) = read ? inFrame : inData;
            }
            complete = complete && moved <= len && (y + 1) * line + pixel * rect.left <= m_capacity;
        }
        part = !complete && moved > 0;
        return complete ? static_cast<int>(moved) : 0;
    }

    void Copy(CModelFrame& source) {
        Apply(m_geometry.Sized(source.m_geometry.width, source.m_geometry.height));
        m_timestamp = source.m_timestamp;
        SetLine(source.m_geometry.LineBytes());
        Apply(m_geometry.Formatted(source.m_geometry.format));
        int len = std::min(m_geometry.DataLen(), source.m_geometry.DataLen());
        if (!source.m_own.empty())
            len = std::min(len, source.m_capacity);
        if (source.Memory() != nullptr)
            Write(Bytes(*source.Memory()), len);
    }

    void Swap(CModelFrame& other) { std::swap(*this, other); }

private:
    static std::size_t At(std::int64_t index) { return static_cast<std::size_t>(index); }

    bool Inside(const TVLRect& rect) const {
        return rect.left >= 0 && rect.top >= 0 && rect.right > rect.left && rect.bottom > rect.top &&
               rect.right <= m_geometry.width && rect.bottom <= m_geometry.height;
    }

    ModelGeometry m_geometry;
    Bytes m_own;
    ModelArena* m_arena = nullptr;
    int m_capacity = 0;
    unsigned m_timestamp = 0;
    IShareFrame::MetaInfo m_meta{};
};
