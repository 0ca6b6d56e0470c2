// SPDX-License-Identifier: Apache-2.0
#include "src/share_region.h"

#include "tests/src/share_region_tools.h"
#include "tests/support/test_effort.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdio>
#include <random>
#include <string>
#include <utility>

/// Regions against sets of single pixels: random sequences of operations are done to both, and both must
/// agree after each. That the comparison would notice is shown on regions with planted faults.

namespace {

constexpr unsigned kFirstSeed = 20'011;
constexpr int kSequences = 10'000;
constexpr int kStepsInASequence = 16;

/// The grid: every coordinate of every rectangle lies in it, on both sides of zero.
constexpr int kLowest = -4;
constexpr int kHighest = 12;
constexpr int kSide = kHighest - kLowest;
constexpr TVLRect kUniverse{kLowest, kLowest, kHighest, kHighest};

/// The slow and obvious region: a bit for each pixel, a word for each row.
class PixelSet {
public:
    static PixelSet Of(const TVLRect& rect) {
        PixelSet set;
        for (int y = rect.top; y < rect.bottom; ++y) {
            for (int x = rect.left; x < rect.right; ++x)
                set.Row(y) |= Bit(x);
        }
        return set;
    }

    bool operator==(const PixelSet& other) const { return m_rows == other.m_rows; }
    bool IsEmpty() const { return *this == PixelSet(); }

    void Combine(const PixelSet& other, RegionCombinOpt option) {
        for (int y = kLowest; y < kHighest; ++y)
            Row(y) = Combined(Row(y), other.Row(y), option);
    }

    /// Rows that look alike and touch share a band.
    Rects ToRects() const {
        Rects rects;
        for (int top = kLowest; top < kHighest;) {
            int bottom = top + 1;
            while (bottom < kHighest && Row(bottom) == Row(top))
                ++bottom;
            AppendBand(top, bottom, rects);
            top = bottom;
        }
        return rects;
    }

    /// By quarters, in whole numbers.
    PixelSet Projected(const TVLRect& origin, int quarters) const {
        const auto project = [quarters](int coordinate, int zero) {
            return (coordinate - zero) * quarters / 4;
        };
        PixelSet projected;
        for (const TVLRect& rect : ToRects()) {
            const TVLRect moved{project(rect.left, origin.left), project(rect.top, origin.top),
                                project(rect.right, origin.left), project(rect.bottom, origin.top)};
            projected.Combine(Of(moved), REGION_COMBINE_OR);
        }
        return projected;
    }

private:
    static unsigned Bit(int x) { return 1u << (x - kLowest); }

    static unsigned Combined(unsigned row, unsigned other, RegionCombinOpt option) {
        switch (option) {
            case REGION_COMBINE_AND:
                return row & other;
            case REGION_COMBINE_COPY:
                return other;
            case REGION_COMBINE_DIFF:
                return row & ~other;
            case REGION_COMBINE_OR:
                return row | other;
            case REGION_COMBINE_XOR:
                return row ^ other;
        }
        return row;
    }

    unsigned& Row(int y) { return m_rows.at(static_cast<std::size_t>(y - kLowest)); }
    unsigned Row(int y) const { return m_rows.at(static_cast<std::size_t>(y - kLowest)); }

    void AppendBand(int top, int bottom, Rects& rects) const {
        const unsigned row = Row(top);
        for (int left = kLowest; left < kHighest; ++left) {
            if ((row & Bit(left)) == 0)
                continue;
            int right = left + 1;
            while (right < kHighest && (row & Bit(right)) != 0)
                ++right;
            rects.push_back({left, top, right, bottom});
            left = right;
        }
    }

    std::array<unsigned, kSide> m_rows{};
};

TVLRect BoxAround(const Rects& rects) {
    if (rects.empty())
        return {0, 0, 0, 0};
    TVLRect box = rects.front();
    for (const TVLRect& rect : rects) {
        box = {std::min(box.left, rect.left), std::min(box.top, rect.top), std::max(box.right, rect.right),
               std::max(box.bottom, rect.bottom)};
    }
    return box;
}

/// One sequence on three regions and their pixel sets. `Region` has the operations of TVLRegion.
template <class RegionType>
class Sequence {
public:
    explicit Sequence(unsigned seed) : m_random(seed) {
        for (std::size_t i = 0; i < kCount * 4; ++i)
            Add(i % kCount);
    }

    /// What went wrong first; empty when all agreed.
    std::string Run() {
        for (int step = 0; step < kStepsInASequence; ++step) {
            const std::string action = DoOneThing();
            for (std::size_t i = 0; i < kCount; ++i) {
                const std::string difference = Difference(i);
                if (!difference.empty())
                    return "step " + std::to_string(step) + " (" + action + "): region " + std::to_string(i) +
                           difference;
            }
        }
        return BrokenLaw();
    }

    long Comparisons() const { return m_comparisons; }
    long ComparedRects() const { return m_comparedRects; }

private:
    static constexpr std::size_t kCount = 3;

    int Pick(int lowest, int highest) {
        return lowest + static_cast<int>(m_random() % static_cast<unsigned>(highest - lowest + 1));
    }

    /// One in some has no area or is turned inside out.
    TVLRect PickRect() {
        const int left = Pick(kLowest, kHighest);
        const int top = Pick(kLowest, kHighest);
        if (Pick(0, 9) == 0)
            return {left, top, Pick(kLowest, kHighest), Pick(kLowest, kHighest)};
        return {left, top, std::min(left + Pick(0, kSide / 2), kHighest),
                std::min(top + Pick(0, kSide / 2), kHighest)};
    }

    std::string DoOneThing() {
        const auto target = static_cast<std::size_t>(Pick(0, kCount - 1));
        const auto source = static_cast<std::size_t>(Pick(0, kCount - 1));
        const int choice = Pick(0, 99);
        if (choice < 30)
            return Add(target);
        if (choice < 50)
            return Exclude(target);
        if (choice < 85) {
            static constexpr RegionCombinOpt options[] = {
                REGION_COMBINE_XOR, REGION_COMBINE_OR,  REGION_COMBINE_DIFF, REGION_COMBINE_XOR,
                REGION_COMBINE_OR,  REGION_COMBINE_AND, REGION_COMBINE_COPY};
            return Combine(target, source, options[static_cast<std::size_t>((choice - 50) / 5)]);
        }
        if (choice < 90)
            return Project(target);
        if (choice < 94)
            return Copy(target, source);
        if (choice < 97)
            return Move(target, source);
        return choice < 98 ? Empty(target) : Set(target);
    }

    std::string Add(std::size_t target) {
        const TVLRect rect = PickRect();
        m_areAnswersTrue &= m_regions.at(target).AddRect(rect);
        m_pixels.at(target).Combine(PixelSet::Of(rect), REGION_COMBINE_OR);
        return "AddRect " + testing::PrintToString(rect);
    }

    std::string Exclude(std::size_t target) {
        const TVLRect rect = PickRect();
        m_areAnswersTrue &= m_regions.at(target).ExcludeRect(rect);
        m_pixels.at(target).Combine(PixelSet::Of(rect), REGION_COMBINE_DIFF);
        return "ExcludeRect " + testing::PrintToString(rect);
    }

    std::string Set(std::size_t target) {
        const TVLRect rect = PickRect();
        m_areAnswersTrue &= m_regions.at(target).SetRectRgn(rect.left, rect.top, rect.right, rect.bottom);
        m_pixels.at(target) = PixelSet::Of(rect);
        return "SetRectRgn " + testing::PrintToString(rect);
    }

    std::string Empty(std::size_t target) {
        m_regions.at(target).Empty();
        m_pixels.at(target) = PixelSet();
        return "Empty";
    }

    std::string Copy(std::size_t target, std::size_t source) {
        m_areAnswersTrue &= m_regions.at(target).CopyRgn(m_regions.at(source));
        m_pixels.at(target) = PixelSet(m_pixels.at(source));
        return "CopyRgn of " + std::to_string(source);
    }

    std::string Move(std::size_t target, std::size_t source) {
        RegionType made(std::move(m_regions.at(source)));
        m_regions.at(target) = std::move(made);
        const PixelSet moved = std::exchange(m_pixels.at(source), PixelSet());
        m_pixels.at(target) = moved;
        return "a move from " + std::to_string(source);
    }

    std::string Combine(std::size_t target, std::size_t source, RegionCombinOpt option) {
        m_areAnswersTrue &= m_regions.at(target).CombineRgn(m_regions.at(source), option);
        m_pixels.at(target).Combine(PixelSet(m_pixels.at(source)), option);
        return "CombineRgn " + std::to_string(option) + " with " + std::to_string(source);
    }

    std::string Project(std::size_t target) {
        // No result leaves the grid.
        const TVLRect origin{Pick(-2, 2), Pick(-2, 2), Pick(kLowest, kHighest), Pick(kLowest, kHighest)};
        const int quarters = Pick(1, 3);
        m_areAnswersTrue &= m_regions.at(target).ProjectRgn(origin, static_cast<float>(quarters) / 4.0F);
        m_pixels.at(target) = m_pixels.at(target).Projected(origin, quarters);
        return "ProjectRgn " + testing::PrintToString(origin) + " by quarters " + std::to_string(quarters);
    }

    std::string Difference(std::size_t index) {
        const RegionType& region = m_regions.at(index);
        const PixelSet& pixels = m_pixels.at(index);
        Rects rects;
        TVLRect box{};
        if (!m_areAnswersTrue || !region.GetRects(rects) || !region.GetRgnBox(box))
            return " answered false";
        ++m_comparisons;
        m_comparedRects += static_cast<long>(rects.size());
        const Rects expected = pixels.ToRects();
        if (rects != expected)
            return " has " + testing::PrintToString(rects) + ", expected " + testing::PrintToString(expected);
        if (box != BoxAround(expected))
            return " has the box " + testing::PrintToString(box);
        if (region.IsEmpty() != pixels.IsEmpty())
            return " is wrong about being empty";
        for (std::size_t other = 0; other < kCount; ++other) {
            if ((region == m_regions.at(other)) != (pixels == m_pixels.at(other)))
                return " is wrong about being equal to " + std::to_string(other);
        }
        return {};
    }

    static RegionType Join(const RegionType& left, RegionCombinOpt option, const RegionType& right) {
        RegionType joined;
        joined.CopyRgn(left);
        joined.CombineRgn(right, option);
        return joined;
    }
    static RegionType And(const RegionType& a, const RegionType& b) { return Join(a, REGION_COMBINE_AND, b); }
    static RegionType Or(const RegionType& a, const RegionType& b) { return Join(a, REGION_COMBINE_OR, b); }
    static RegionType Xor(const RegionType& a, const RegionType& b) { return Join(a, REGION_COMBINE_XOR, b); }
    static RegionType Diff(const RegionType& a, const RegionType& b) {
        return Join(a, REGION_COMBINE_DIFF, b);
    }
    static RegionType Not(const RegionType& region) {
        RegionType rest;
        rest.AddRect(kUniverse);
        rest.CombineRgn(region, REGION_COMBINE_DIFF);
        return rest;
    }

    /// The name of a law that the three regions break; empty when they keep all.
    std::string BrokenLaw() const {
        const RegionType& a = m_regions[0];
        const RegionType& b = m_regions[1];
        const RegionType& c = m_regions[2];
        const std::pair<const char*, bool> laws[] = {
            {"AND commutes", And(a, b) == And(b, a)},
            {"OR commutes", Or(a, b) == Or(b, a)},
            {"XOR commutes", Xor(a, b) == Xor(b, a)},
            {"AND associates", And(And(a, b), c) == And(a, And(b, c))},
            {"OR associates", Or(Or(a, b), c) == Or(a, Or(b, c))},
            {"XOR associates", Xor(Xor(a, b), c) == Xor(a, Xor(b, c))},
            {"AND distributes", And(a, Or(b, c)) == Or(And(a, b), And(a, c))},
            {"OR distributes", Or(a, And(b, c)) == And(Or(a, b), Or(a, c))},
            {"AND with itself", And(a, a) == a},
            {"OR with itself", Or(a, a) == a},
            {"XOR with itself", Xor(a, a).IsEmpty()},
            {"DIFF with itself", Diff(a, a).IsEmpty()},
            {"absorption by OR", Or(a, And(a, b)) == a},
            {"absorption by AND", And(a, Or(a, b)) == a},
            {"not of OR", Not(Or(a, b)) == And(Not(a), Not(b))},
            {"not of AND", Not(And(a, b)) == Or(Not(a), Not(b))},
            {"not of not", Not(Not(a)) == a},
            {"DIFF is AND with not", Diff(a, b) == And(a, Not(b))},
            {"parts make the whole", Or(Diff(a, b), And(a, b)) == a},
            {"parts are apart", And(Diff(a, b), b).IsEmpty()},
            {"XOR is both differences", Xor(a, b) == Or(Diff(a, b), Diff(b, a))},
            {"XOR undoes itself", Xor(Xor(a, b), b) == a},
        };
        for (const auto& law : laws) {
            if (!law.second)
                return std::string("broken law: ") + law.first;
        }
        return {};
    }

    std::mt19937 m_random;
    std::array<RegionType, kCount> m_regions;
    std::array<PixelSet, kCount> m_pixels;
    bool m_areAnswersTrue = true;
    long m_comparisons = 0;
    long m_comparedRects = 0;
};

struct Outcome {
    std::string disagreement; ///< The first; empty when all agreed.
    long comparisons = 0;
    long rects = 0; ///< In all regions that were compared.
};

template <class RegionType>
Outcome RunSequences(int sequences) {
    Outcome outcome;
    for (int i = 0; i < sequences && outcome.disagreement.empty(); ++i) {
        const unsigned seed = kFirstSeed + static_cast<unsigned>(i);
        Sequence<RegionType> sequence(seed);
        const std::string disagreement = sequence.Run();
        if (!disagreement.empty())
            outcome.disagreement = "seed " + std::to_string(seed) + ", " + disagreement;
        outcome.comparisons += sequence.Comparisons();
        outcome.rects += sequence.ComparedRects();
    }
    return outcome;
}

TEST(TVLRegionOracle, AgreesWithASetOfPixelsAndKeepsTheLawsOfSets) {
    const int sequences = TestRounds(kSequences);
    std::printf("%d sequences of %d steps, seeds from %u\n", sequences, kStepsInASequence, kFirstSeed);
    const Outcome outcome = RunSequences<TVLRegion>(sequences);
    EXPECT_EQ(outcome.disagreement, "");
    std::printf("%ld comparisons, %ld rectangles\n", outcome.comparisons, outcome.rects);
    EXPECT_GT(outcome.rects, 2 * outcome.comparisons) << "regions of that little content show nothing";
}

struct XorForgetsTheOther : TVLRegion {
    bool CombineRgn(const TVLRegion& other, RegionCombinOpt option) {
        return TVLRegion::CombineRgn(other, option == REGION_COMBINE_XOR ? REGION_COMBINE_DIFF : option);
    }
};
struct ExcludesOneColumnLess : TVLRegion {
    bool ExcludeRect(const TVLRect& rect) {
        return TVLRegion::ExcludeRect({rect.left, rect.top, rect.right - 1, rect.bottom});
    }
};
struct AddsRectanglesWithoutArea : TVLRegion {
    bool AddRect(const TVLRect& rect) {
        const bool hasNoWidth = rect.left == rect.right && rect.right < kHighest;
        return TVLRegion::AddRect({rect.left, rect.top, rect.right + (hasNoWidth ? 1 : 0), rect.bottom});
    }
};
struct ProjectsFromOneAbove : TVLRegion {
    bool ProjectRgn(const TVLRect& origin, float scale) {
        return TVLRegion::ProjectRgn({origin.left, origin.top - 1, 0, 0}, scale);
    }
};
struct GivesItsRectanglesBackwards : TVLRegion {
    bool GetRects(Rects& rects) const {
        const bool isGiven = TVLRegion::GetRects(rects);
        rects = Rects(rects.rbegin(), rects.rend());
        return isGiven;
    }
};
struct KeepsWhatIsMovedAway : TVLRegion {
    KeepsWhatIsMovedAway() = default;
    KeepsWhatIsMovedAway(KeepsWhatIsMovedAway&& other) noexcept : TVLRegion() { CopyRgn(other); }
    KeepsWhatIsMovedAway& operator=(KeepsWhatIsMovedAway&& other) noexcept = default;
};
struct HasABoxWhenEmpty : TVLRegion {
    bool GetRgnBox(TVLRect& box) const {
        if (IsEmpty()) {
            box = {1, 1, 1, 1};
            return true;
        }
        return TVLRegion::GetRgnBox(box);
    }
};
struct AnswersFalse : TVLRegion {
    bool CopyRgn(const TVLRegion& other) { return !TVLRegion::CopyRgn(other); }
};

struct IsEqualToWhatItContains : TVLRegion {
    bool operator==(const IsEqualToWhatItContains& other) const {
        TVLRegion rest;
        rest.CopyRgn(other);
        rest.CombineRgn(*this, REGION_COMBINE_DIFF);
        return rest.IsEmpty();
    }
};

template <class RegionType>
class TVLRegionOracleOnAFault : public testing::Test {};
using Faults = testing::Types<XorForgetsTheOther, ExcludesOneColumnLess, AddsRectanglesWithoutArea,
                              ProjectsFromOneAbove, GivesItsRectanglesBackwards, KeepsWhatIsMovedAway,
                              HasABoxWhenEmpty, AnswersFalse, IsEqualToWhatItContains>;
TYPED_TEST_SUITE(TVLRegionOracleOnAFault, Faults);

TYPED_TEST(TVLRegionOracleOnAFault, NoticesIt) {
    const Outcome outcome = RunSequences<TypeParam>(kSequences / 100);
    EXPECT_NE(outcome.disagreement, "");
    std::printf("%s\n", outcome.disagreement.c_str());
}

} // namespace
