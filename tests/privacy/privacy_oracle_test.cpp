// SPDX-License-Identifier: Apache-2.0
#include "tests/privacy/privacy_oracle.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <cstdint>
#include <vector>

namespace {

constexpr std::uint32_t GREEN = 0x00FF00;

/// A frame of 20x20 points from the desktop's origin, all of one colour.
class OneColour {
public:
    explicit OneColour(std::uint32_t rgb, int pixels = 20)
        : m_pixels(static_cast<std::size_t>(pixels) * static_cast<std::size_t>(pixels) * 4) {
        for (std::size_t i = 0; i < m_pixels.size(); i += 4) {
            m_pixels[i] = static_cast<std::uint8_t>(rgb >> 16);
            m_pixels[i + 1] = static_cast<std::uint8_t>(rgb >> 8);
            m_pixels[i + 2] = static_cast<std::uint8_t>(rgb);
        }
        frame.pixels = m_pixels.data();
        frame.stride = static_cast<std::size_t>(pixels) * 4;
        frame.width = pixels;
        frame.height = pixels;
        frame.rect = {{0, 0}, {20, 20}};
    }

    PrivacyFrame frame;

private:
    std::vector<std::uint8_t> m_pixels;
};

PrivacyWindow Kept(const platform::CGRect& rect, float alpha = 1.0F) {
    return {PrivacyRole::Kept, rect, GREEN, alpha};
}
PrivacyWindow KeptOut(const platform::CGRect& rect, float alpha = 1.0F) {
    return {PrivacyRole::KeptOut, rect, 0xFF0000, alpha};
}

constexpr platform::CGRect INNER{{5, 5}, {10, 10}};
constexpr platform::CGRect WHOLE{{-9, -9}, {40, 40}};

} // namespace

TEST(PrivacyOracle, CallsRedInsideAWindowThatIsKeptOutALeakAndRedAtItsEdgesNone) {
    const PrivacyFindings findings = JudgePrivacy({KeptOut(INNER)}, OneColour(0xFF0000).frame);
    EXPECT_EQ(findings.forbidden, 8 * 8);
    EXPECT_EQ(findings.leaks, 8 * 8);
    EXPECT_EQ(findings.redNearEdges, 12 * 12 - 8 * 8);
    EXPECT_EQ(findings.redElsewhere, 20 * 20 - 12 * 12);
}

TEST(PrivacyOracle, CallsTheFaintestRedALeak) {
    EXPECT_EQ(JudgePrivacy({KeptOut(INNER)}, OneColour(0x01FFFF).frame).leaks, 8 * 8);
}

TEST(PrivacyOracle, FindsNoLeakWithoutRed) {
    const PrivacyFindings findings = JudgePrivacy({KeptOut(INNER)}, OneColour(0x00FFFF).frame);
    EXPECT_EQ(findings.forbidden, 8 * 8);
    EXPECT_EQ(findings.leaks, 0);
}

TEST(PrivacyOracle, ForbidsWhatIsBehindAnOpaqueKeptWindow) {
    const PrivacyFindings findings = JudgePrivacy({Kept(WHOLE), KeptOut(INNER)}, OneColour(0xFF0000).frame);
    EXPECT_EQ(findings.leaks, 8 * 8);
    EXPECT_EQ(findings.keptInFront, 20 * 20);
    EXPECT_EQ(findings.keptShown, 0);
}

TEST(PrivacyOracle, CountsWhatShinesThroughAKeptWindowByItself) {
    for (const float alpha : {0.0F, 0.5F}) {
        const PrivacyFindings findings =
            JudgePrivacy({Kept(WHOLE, alpha), KeptOut(INNER)}, OneColour(0x800000).frame);
        EXPECT_EQ(findings.leaks, 0);
        EXPECT_EQ(findings.redThroughKept, 8 * 8);
    }
}

TEST(PrivacyOracle, ForbidsWhatIsBehindAnOpaqueWindowThatSomethingTranslucentIsInFrontOf) {
    const PrivacyFindings findings =
        JudgePrivacy({Kept(WHOLE, 0.5F), Kept(WHOLE), KeptOut(INNER)}, OneColour(0x800000).frame);
    EXPECT_EQ(findings.leaks, 8 * 8);
    EXPECT_EQ(findings.keptInFront, 0);
}

TEST(PrivacyOracle, ForbidsNothingWhereATransparentWindowIsKeptOut) {
    EXPECT_EQ(JudgePrivacy({KeptOut(INNER, 0)}, OneColour(0).frame).forbidden, 0);
}

TEST(PrivacyOracle, SeesLifeWhereAKeptWindowIsInFrontAndShown) {
    const PrivacyFindings findings = JudgePrivacy({Kept(INNER), KeptOut(WHOLE)}, OneColour(GREEN).frame);
    EXPECT_EQ(findings.keptInFront, 8 * 8);
    EXPECT_EQ(findings.keptShown, 8 * 8);
    EXPECT_EQ(JudgePrivacy({Kept(INNER), KeptOut(WHOLE)}, OneColour(0x009E9E).frame).keptShown, 0);
}

TEST(PrivacyOracle, MeasuresEdgesInPixelsOfTheFrame) {
    EXPECT_EQ(JudgePrivacy({KeptOut(INNER)}, OneColour(0xFF0000, 40).frame).leaks, 18 * 18);
    EXPECT_EQ(JudgePrivacy({KeptOut(INNER)}, OneColour(0xFF0000, 10).frame).leaks, 2 * 2);
}
