// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

/// Scaling of pixels of 4 bytes, whatever the bytes stand for: each is scaled for itself.
namespace platform {

enum class ScaleFilter {
    Bilinear, ///< Between the nearest pixels.
    Box,      ///< Likewise up; down, the mean of the pixels that one of the result stands for.
};

struct ScaleSource {
    const std::uint8_t* pixels = nullptr;
    std::size_t stride = 0; ///< Bytes.
    int width = 0;          ///< At least 1.
    int height = 0;
};

/// What is wanted of one axis of the scaled picture: at least one place, all of them within.
struct ScaleSpan {
    std::int64_t size = 0; ///< Of the whole picture.
    std::int64_t first = 0;
    int count = 0;
};

/// Scales any part of a picture by any factor, a row at a time.
/// Lifetime: the source's pixels must stay. Threads: one at a time.
class RowScaler {
public:
    /// Throws std::bad_alloc.
    RowScaler(const ScaleSource& source, const ScaleSpan& columns, const ScaleSpan& rows, ScaleFilter filter);

    /// Row `y` of the part that is wanted, from 0; valid until the next call.
    const std::uint8_t* Row(int y);

private:
    /// What the places of one axis are made of.
    struct Axis {
        struct Place {
            int first = 0;           // of the source
            std::size_t weights = 0; // the first one; they go on to those of the next place
        };
        std::vector<Place> places;  // and one more, behind the last
        std::vector<float> weights; // those of a place add up to 1

        int TapsOf(int place) const;
        int SourceEnd(int place) const;
    };

    static Axis MakeAxis(int sourceSize, const ScaleSpan& span, ScaleFilter filter);
    static void AddPlace(Axis& axis, int first, const std::vector<double>& shares);
    void ScaleHeight(int y);
    void ScaleWidth();

    const ScaleSource m_source;
    const Axis m_columns;
    const Axis m_rows;
    const int m_sourceLeft; // the columns that are looked at
    const int m_sourceRight;
    std::vector<float> m_sums; // of one row, scaled in height only
    std::vector<float> m_scaled;
    std::vector<std::uint8_t> m_row;
};

/// Whether ScaleDownRows can do it: down to between a half and the whole, to a half or to a quarter.
bool CanScaleDownRows(const ScaleSource& source, std::int64_t width, std::int64_t height);

/// Scales a whole picture down and writes rows `first` to `first` + `count` of the result, whose top row is
/// at `target`; they are the same whichever are written with them. With the box filter, pixels between a half
/// and the whole are taken from the nearest ones. Much faster than RowScaler. False when it can't, and
/// nothing is written.
bool ScaleDownRows(const ScaleSource& source, std::uint8_t* target, std::size_t stride, int width, int height,
                   int first, int count, ScaleFilter filter) noexcept;

} // namespace platform
