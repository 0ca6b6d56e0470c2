// SPDX-License-Identifier: Apache-2.0
// A context against a plain model of it, through long random sequences of everything that paints.
#include "tests/platform/bitmap_tools.h"
#include "tests/support/test_effort.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <limits>
#include <map>
#include <random>
#include <sstream>
#include <string>
#include <utility>

namespace {

using namespace platform;

/// What the model gets wrong on purpose, to show that a run would notice.
enum class Fault {
    None,
    CountsFromTheTop,
    CutsInsteadOfRounding,
    IgnoresAlpha,
    LeavesTheFourthByte,
    MultipliesColoursAgain,
    DrawsMirrored,
};

struct Box {
    double left, top, right, bottom; // whole numbers

    bool Contains(int x, int y) const { return x >= left && x < right && y >= top && y < bottom; }
    double Width() const { return right - left; }
    double Height() const { return bottom - top; }
};

/// Colours of one pixel in real numbers, 0 to 255.
struct RealColour {
    double red = 0, green = 0, blue = 0, alpha = 0;

    void Add(const Colour& colour, double share) {
        red += colour.red * share;
        green += colour.green * share;
        blue += colour.blue * share;
        alpha += colour.alpha * share;
    }
};

/// The plainest possible context: every pixel for itself, in real numbers.
class Model {
public:
    Model(const Canvas& canvas, Fault fault) : m_fault(fault), m_canvas(canvas) {}

    /// Nothing where the rectangle paints nothing.
    Box BoxOf(const CGRect& rect) const {
        const auto [left, right] = Ends(rect.origin.x, rect.size.width);
        const auto [low, high] = Ends(rect.origin.y, rect.size.height);
        if (m_fault == Fault::CountsFromTheTop)
            return {left, low, right, high};
        return {left, m_canvas.height - high, right, m_canvas.height - low};
    }

    Colour Cleared() const { return {0, 0, 0, Has(CGPixelLayout::RGB) ? 255 : 0}; }

    Colour Over(const RealColour& above, const Colour& below) const {
        if (m_fault == Fault::IgnoresAlpha)
            return Stored(above);
        const double rest = 1 - above.alpha / 255;
        const double again = m_fault == Fault::MultipliesColoursAgain ? above.alpha / 255 : 1;
        return Stored({above.red * again + below.red * rest, above.green * again + below.green * rest,
                       above.blue * again + below.blue * rest, above.alpha + below.alpha * rest});
    }

    /// What an image shows at a pixel of its box.
    RealColour Sample(const CGImage& image, const Box& box, int x, int y, bool isMean) const {
        const double stepX = image.width / box.Width();
        const double stepY = image.height / box.Height();
        const double column = m_fault == Fault::DrawsMirrored ? box.right - 1 - x : x - box.left;
        RealColour sum;
        ForShares(image.width, stepX, column, isMean, [&](int sourceX, double shareX) {
            ForShares(image.height, stepY, y - box.top, isMean, [&](int sourceY, double shareY) {
                Colour colour = PixelOf(image, sourceX, sourceY);
                if (!CGHasAlpha(image.layout))
                    colour.alpha = 255;
                sum.Add(colour, shareX * shareY);
            });
        });
        return sum;
    }

private:
    bool Has(CGPixelLayout layout) const { return m_canvas.layout == layout; }

    std::pair<double, double> Ends(double origin, double length) const {
        double from = std::min(origin, origin + length);
        double to = std::max(origin, origin + length);
        if (!(from < to))
            return {0, 0};
        const double middle = std::floor((from + to) / 2);
        from = Whole(from);
        to = Whole(to);
        return from < to ? std::pair(from, to) : std::pair(middle, middle + 1);
    }
    double Whole(double value) const {
        const double whole = std::floor(m_fault == Fault::CutsInsteadOfRounding ? value : value + 0.5);
        return std::clamp<double>(whole, std::numeric_limits<int>::min(), std::numeric_limits<int>::max());
    }

    Colour Stored(const RealColour& colour) const {
        const auto byte = [](double value) { return static_cast<int>(std::min(value + 0.5, 255.0)); };
        const bool hasFourthByte =
            m_fault != Fault::LeavesTheFourthByte && !Has(CGPixelLayout::RGBA) && !Has(CGPixelLayout::ARGB);
        return {byte(colour.red), byte(colour.green), byte(colour.blue),
                hasFourthByte ? 255 : byte(colour.alpha)};
    }

    template <class Use>
    static void ForShares(int size, double step, double place, bool isMean, Use use) {
        if (isMean && step > 1) {
            const double from = place * step;
            const double to = from + step;
            for (int at = 0; at < size; ++at) {
                const double share = std::min(at + 1.0, to) - std::max<double>(at, from);
                if (share > 0)
                    use(at, share / step);
            }
            return;
        }
        const double middle = std::clamp((place + 0.5) * step - 0.5, 0.0, size - 1.0);
        const int first = static_cast<int>(middle);
        use(first, 1 - (middle - first));
        if (first + 1 < size)
            use(first + 1, middle - first);
    }

    const Fault m_fault;
    const Canvas& m_canvas;
};

using Happened = std::map<std::string, long>;

/// Plays one random sequence on a context, and after each step compares all of its memory with the model.
class Duel {
public:
    Duel(std::uint64_t seed, Fault fault, Happened& happened)
        : m_random(seed),
          m_happened(happened),
          m_canvas(Between(1, 40), Between(1, 40), ALL_INFOS[static_cast<std::size_t>(Between(0, 3))],
                   Between(0, 7)),
          m_model(m_canvas, fault) {
        for (std::uint8_t& byte : m_canvas.memory)
            byte = Byte();
    }

    std::string FirstDisagreement(int steps) {
        for (int step = 0; step < steps; ++step) {
            const Bytes before = m_canvas.memory;
            const std::string operation = Step(before);
            if (!m_difference.empty())
                return operation + " at step " + std::to_string(step) + ": " + m_difference;
        }
        return {};
    }

private:
    int Between(int low, int high) { return std::uniform_int_distribution<int>(low, high)(m_random); }
    std::uint8_t Byte() { return static_cast<std::uint8_t>(Between(0, 255)); }
    bool OneIn(int count) { return Between(1, count) == 1; }

    float Coordinate() {
        constexpr float limits[] = {std::numeric_limits<float>::quiet_NaN(),
                                    std::numeric_limits<float>::infinity(),
                                    -std::numeric_limits<float>::max(), 3e9F, -3e9F};
        if (OneIn(60))
            return limits[Between(0, 4)];
        const auto quarter = static_cast<float>(Between(-160, 320)) / 4;
        return OneIn(2) ? std::floor(quarter / 2) : quarter / 2;
    }
    CGRect Rect() { return {{Coordinate(), Coordinate()}, {Coordinate(), Coordinate()}}; }

    std::string Step(const Bytes& before) {
        switch (Between(0, 3)) {
            case 0:
                return Fill(before);
            case 1:
                return Clear(before);
            default:
                return Draw(before);
        }
    }

    std::string Fill(const Bytes& before) {
        const auto component = [&] { return static_cast<float>(Between(-20, 275)) / 255; };
        const float red = component(), green = component(), blue = component();
        const float alpha = OneIn(2) ? 1 : component();
        const CGRect rect = Rect();
        CGContextSetRGBFillColor(m_canvas.Get(), red, green, blue, alpha);
        CGContextFillRect(m_canvas.Get(), rect);

        const auto unit = [](float value) { return std::clamp(value, 0.0F, 1.0F); };
        const auto stored = [&](float value) {
            return std::floor(double{unit(value)} * unit(alpha) * 255 + 0.5);
        };
        const RealColour colour{stored(red), stored(green), stored(blue),
                                std::floor(unit(alpha) * 255 + 0.5)};
        Compare(before, m_model.BoxOf(rect), 0,
                [&](int, int, const Colour& below) { return m_model.Over(colour, below); });
        Count("fills");
        return "fill " + Text(rect);
    }

    std::string Clear(const Bytes& before) {
        const CGRect rect = Rect();
        CGContextClearRect(m_canvas.Get(), rect);
        Compare(before, m_model.BoxOf(rect), 0, [&](int, int, const Colour&) { return m_model.Cleared(); });
        Count("clears");
        return "clear " + Text(rect);
    }

    CGImageRef RandomImage() {
        const CGPixelLayout layout = ALL_LAYOUTS[static_cast<std::size_t>(Between(0, 6))];
        return MakeImage(
            Between(1, 40), Between(1, 40), layout,
            [&](int, int) {
                const int alpha = OneIn(3) ? 255 : Between(0, 255);
                const int most = CGHasAlpha(layout) ? alpha : 255;
                return Colour{Between(0, most), Between(0, most), Between(0, most), alpha};
            },
            static_cast<std::size_t>(Between(0, 5)));
    }

    float Shrunk(int length, int part, int room) {
        const int shortest = std::min((length + part - 1) / part, room);
        return static_cast<float>(part == 4 ? shortest
                                            : Between(shortest, std::clamp(length, shortest, room)));
    }

    std::string Draw(const Bytes& before) {
        const CGImageRef image = RandomImage();
        CGRect rect = Rect();
        if (OneIn(3)) {
            rect.size = {static_cast<float>(image->width), static_cast<float>(image->height)};
        } else if (OneIn(2)) { // wholly inside, and down to a half or a quarter if there is room
            const int part = OneIn(4) ? 4 : Between(1, 2);
            rect = {
                {0, 0},
                {Shrunk(image->width, part, m_canvas.width), Shrunk(image->height, part, m_canvas.height)}};
        }
        const bool isHigh = OneIn(2);
        CGContextSetInterpolationQuality(m_canvas.Get(),
                                         isHigh ? kCGInterpolationHigh : kCGInterpolationDefault);
        CGContextDrawImage(m_canvas.Get(), rect, image.get());

        const bool isFinite = std::isfinite(rect.origin.x) && std::isfinite(rect.origin.y) &&
                              std::isfinite(rect.size.width) && std::isfinite(rect.size.height);
        const Box box = isFinite ? m_model.BoxOf(rect) : Box{};
        const bool isUnscaled = box.Width() == image->width && box.Height() == image->height;
        const bool isOpaqueToHalf = !CGHasAlpha(image->layout) && box.Width() <= image->width &&
                                    box.Height() <= image->height && box.Width() * 2 >= image->width &&
                                    box.Height() * 2 >= image->height;
        // Down to a half an opaque image may be taken either way, and with weights of a few bits only.
        const int lenience = isUnscaled ? 0 : isOpaqueToHalf ? 5 : 2;
        Compare(
            before, box, lenience,
            [&](int x, int y, const Colour& below) {
                return m_model.Over(m_model.Sample(*image, box, x, y, isHigh), below);
            },
            [&](int x, int y, const Colour& below) {
                return m_model.Over(m_model.Sample(*image, box, x, y, isHigh && !isOpaqueToHalf), below);
            });
        Count(isUnscaled ? "unscaled draws" : isOpaqueToHalf ? "draws to a half" : "other draws");
        return "draw " + std::to_string(image->width) + "x" + std::to_string(image->height) + " of layout " +
               std::to_string(static_cast<int>(image->layout)) + (isHigh ? " high" : "") + " into " +
               Text(rect);
    }

    template <class Expect>
    void Compare(const Bytes& before, const Box& box, int lenience, Expect expect) {
        Compare(before, box, lenience, expect, expect);
    }

    template <class Expect, class Alternative>
    void Compare(const Bytes& before, const Box& box, int lenience, Expect expect, Alternative alternative) {
        Bytes kept = before;
        bool painted = false;
        for (int y = 0; y < m_canvas.height; ++y) {
            for (int x = 0; x < m_canvas.width; ++x) {
                if (!box.Contains(x, y))
                    continue;
                painted = true;
                const std::size_t place = m_canvas.Place(x, y);
                const Colour below = ReadPixel(m_canvas.layout, &before[place]);
                const Colour found = m_canvas.At(x, y);
                const Colour expected = expect(x, y, below);
                if (!IsNear(found, expected, lenience) && !IsNear(found, alternative(x, y, below), lenience))
                    Note(x, y, found, expected);
                WritePixel(m_canvas.layout, &kept[place], found);
            }
        }
        if (kept != m_canvas.memory && m_difference.empty())
            m_difference = "something was painted beside the rectangle";
        Count(painted ? "painted something" : "painted nothing");
    }

    static bool IsNear(const Colour& a, const Colour& b, int lenience) {
        return std::abs(a.red - b.red) <= lenience && std::abs(a.green - b.green) <= lenience &&
               std::abs(a.blue - b.blue) <= lenience && std::abs(a.alpha - b.alpha) <= lenience;
    }

    void Note(int x, int y, const Colour& found, const Colour& expected) {
        if (!m_difference.empty())
            return;
        std::ostringstream text;
        text << "pixel " << x << "," << y << " is " << found << " and should be " << expected << " in "
             << m_canvas.width << "x" << m_canvas.height << " of layout "
             << static_cast<int>(m_canvas.layout);
        m_difference = text.str();
    }

    static std::string Text(const CGRect& rect) {
        std::ostringstream text;
        text << rect.origin.x << "," << rect.origin.y << " " << rect.size.width << "x" << rect.size.height;
        return text.str();
    }

    void Count(const std::string& what) { ++m_happened[what]; }

    std::mt19937_64 m_random;
    Happened& m_happened;
    Canvas m_canvas;
    Model m_model;
    std::string m_difference;
};

constexpr int STEPS = 12;

std::string FirstDisagreement(int duels, std::uint64_t seed, Fault fault, Happened& happened) {
    for (int i = 0; i < duels; ++i) {
        Duel duel(seed + static_cast<std::uint64_t>(i), fault, happened);
        if (std::string difference = duel.FirstDisagreement(STEPS); !difference.empty())
            return "seed " + std::to_string(seed + static_cast<std::uint64_t>(i)) + ", " + difference;
    }
    return {};
}

} // namespace

TEST(CGContextRandom, PaintsWhatAPlainModelPaints) {
    const int duels = 400 * TestEffort();
    const std::uint64_t seed = std::random_device{}();
    std::printf("%d sequences of %d steps from seed %llu\n", duels, STEPS,
                static_cast<unsigned long long>(seed));
    Happened happened;
    EXPECT_EQ(FirstDisagreement(duels, seed, Fault::None, happened), "");
    for (const char* const what : {"fills", "clears", "unscaled draws", "draws to a half", "other draws",
                                   "painted something", "painted nothing"})
        EXPECT_GT(happened[what], duels / 40) << what;
}

TEST(CGContextRandom, NoticesAModelThatIsWrong) {
    for (const Fault fault :
         {Fault::CountsFromTheTop, Fault::CutsInsteadOfRounding, Fault::IgnoresAlpha,
          Fault::LeavesTheFourthByte, Fault::MultipliesColoursAgain, Fault::DrawsMirrored}) {
        Happened happened;
        EXPECT_NE(FirstDisagreement(60, 1, fault, happened), "") << static_cast<int>(fault);
    }
}
