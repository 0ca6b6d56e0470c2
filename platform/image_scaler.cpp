// SPDX-License-Identifier: Apache-2.0
#include "platform/image_scaler.h"

#include <libyuv.h>

#include <algorithm>
#include <cstring>
#include <limits>

namespace platform {

namespace {

// The components of a pixel, worked on at once: an extension that g++ and clang share.
using Quad = float __attribute__((vector_size(16)));

/// The mean of all that lies under a place. Gives the first pixel and, in `shares`, how much of each counts.
int BoxShares(double place, double step, int sourceSize, std::vector<double>& shares) {
    const double begin = place * step;
    const double end = begin + step;
    const int first = std::min(static_cast<int>(begin), sourceSize - 1);
    shares.clear();
    for (int at = first; at < sourceSize && (at < end || shares.empty()); ++at)
        shares.push_back(std::max(std::min(at + 1.0, end) - std::max<double>(at, begin), 0.0));
    return first;
}

/// The two pixels around the middle of a place.
int BilinearShares(double place, double step, int sourceSize, std::vector<double>& shares) {
    const double middle = std::clamp((place + 0.5) * step - 0.5, 0.0, sourceSize - 1.0);
    const int first = static_cast<int>(middle);
    const double toNext = middle - first;
    shares.assign(1, 1 - toNext);
    if (first + 1 < sourceSize)
        shares.push_back(toNext);
    return first;
}

} // namespace

int RowScaler::Axis::TapsOf(int place) const {
    const auto at = static_cast<std::size_t>(place);
    return static_cast<int>(places[at + 1].weights - places[at].weights);
}

int RowScaler::Axis::SourceEnd(int place) const {
    return places[static_cast<std::size_t>(place)].first + TapsOf(place);
}

RowScaler::RowScaler(const ScaleSource& source, const ScaleSpan& columns, const ScaleSpan& rows,
                     ScaleFilter filter)
    : m_source(source),
      m_columns(MakeAxis(source.width, columns, filter)),
      m_rows(MakeAxis(source.height, rows, filter)),
      m_sourceLeft(m_columns.places.front().first),
      m_sourceRight(m_columns.SourceEnd(columns.count - 1)),
      m_sums(static_cast<std::size_t>(m_sourceRight - m_sourceLeft) * 4),
      m_scaled(static_cast<std::size_t>(columns.count) * 4),
      m_row(static_cast<std::size_t>(columns.count) * 4) {}

RowScaler::Axis RowScaler::MakeAxis(int sourceSize, const ScaleSpan& span, ScaleFilter filter) {
    const double step = sourceSize / static_cast<double>(span.size);
    const bool isBox = filter == ScaleFilter::Box && step > 1;
    Axis axis;
    std::vector<double> shares;
    for (int i = 0; i < span.count; ++i) {
        const auto place = static_cast<double>(span.first + i);
        const int first = isBox ? BoxShares(place, step, sourceSize, shares)
                                : BilinearShares(place, step, sourceSize, shares);
        AddPlace(axis, first, shares);
    }
    axis.places.push_back({0, axis.weights.size()});
    return axis;
}

void RowScaler::AddPlace(Axis& axis, int first, const std::vector<double>& shares) {
    double all = 0;
    for (const double share : shares)
        all += share;
    axis.places.push_back({first, axis.weights.size()});
    for (const double share : shares)
        axis.weights.push_back(static_cast<float>(share / all));
}

const std::uint8_t* RowScaler::Row(int y) {
    ScaleHeight(y);
    ScaleWidth();
    return m_row.data();
}

void RowScaler::ScaleHeight(int y) {
    const Axis::Place place = m_rows.places[static_cast<std::size_t>(y)];
    const float* const weights = m_rows.weights.data() + place.weights;
    const std::uint8_t* source = m_source.pixels + static_cast<std::size_t>(place.first) * m_source.stride +
                                 static_cast<std::size_t>(m_sourceLeft) * 4;
    const std::size_t size = m_sums.size();
    float* const sums = m_sums.data();
    std::fill(m_sums.begin(), m_sums.end(), 0.0F);
    for (int tap = 0; tap < m_rows.TapsOf(y); ++tap, source += m_source.stride) {
        const float weight = weights[tap];
        for (std::size_t i = 0; i < size; ++i)
            sums[i] += static_cast<float>(source[i]) * weight;
    }
}

void RowScaler::ScaleWidth() {
    const float* weight = m_columns.weights.data();
    const Axis::Place* const places = m_columns.places.data();
    const std::size_t count = m_columns.places.size() - 1;
    const float* const sums = m_sums.data();
    float* const scaled = m_scaled.data();
    for (std::size_t x = 0; x < count; ++x) {
        const float* in = sums + static_cast<std::size_t>(places[x].first - m_sourceLeft) * 4;
        const float* const end = weight + (places[x + 1].weights - places[x].weights);
        Quad sum{0.5F, 0.5F, 0.5F, 0.5F}; // to round, as what follows is cut off
        for (; weight != end; ++weight, in += 4) {
            Quad pixel;
            std::memcpy(&pixel, in, sizeof(pixel));
            sum += pixel * *weight;
        }
        std::memcpy(scaled + x * 4, &sum, sizeof(sum));
    }
    std::uint8_t* const row = m_row.data();
    for (std::size_t i = 0; i < count * 4; ++i)
        row[i] = static_cast<std::uint8_t>(static_cast<int>(scaled[i]));
}

bool CanScaleDownRows(const ScaleSource& source, std::int64_t width, std::int64_t height) {
    // Further down than below, or with a side of one pixel, libyuv leaves pixels out; and it counts in 32
    // bits.
    constexpr int SMALLEST = 2;
    constexpr int LARGEST = 16384;
    if (std::min(source.width, source.height) < SMALLEST || std::max(source.width, source.height) > LARGEST ||
        source.stride > std::numeric_limits<int>::max())
        return false;
    const bool isUpToHalf = width <= source.width && height <= source.height && width * 2 >= source.width &&
                            height * 2 >= source.height;
    const bool isQuarter = width * 4 == source.width && height * 4 == source.height;
    return isUpToHalf || isQuarter;
}

bool ScaleDownRows(const ScaleSource& source, std::uint8_t* target, std::size_t stride, int width, int height,
                   int first, int count, ScaleFilter filter) noexcept {
    return libyuv::ARGBScaleClip(source.pixels, static_cast<int>(source.stride), source.width, source.height,
                                 target, static_cast<int>(stride), width, height, 0, first, width, count,
                                 filter == ScaleFilter::Box ? libyuv::kFilterBox : libyuv::kFilterBilinear) ==
           0;
}

} // namespace platform
