// SPDX-License-Identifier: Apache-2.0
#include "tests/privacy/thumbnail_judge.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <string>
#include <vector>

/// Whether a judge of thumbnails knows a wrong one.

namespace {

constexpr unsigned WINDOW = 7;
constexpr unsigned APPLICATION = 70;
constexpr std::uint32_t OWN = 0x004180;
constexpr std::uint32_t OTHER = 0x0041A5;
constexpr int WIDTH = 6;
constexpr int HEIGHT = 4;
constexpr long PIXELS = WIDTH * HEIGHT;

/// A picture of one colour, but for its last pixels.
class Picture {
public:
    explicit Picture(std::uint32_t rgb, std::uint32_t last = 0, int lasts = 0) {
        for (int i = 0; i < WIDTH * HEIGHT; ++i) {
            const std::uint32_t shown = i < WIDTH * HEIGHT - lasts ? rgb : last;
            for (const unsigned shift : {16U, 8U, 0U})
                m_bytes.push_back(static_cast<unsigned char>(shown >> shift & 0xFFU));
            m_bytes.push_back(0xFF);
        }
    }
    ImageData Image() { return {SHARE_FRAME_FORMAT_RGBA, WIDTH, HEIGHT, WIDTH * 4, m_bytes.data()}; }

private:
    std::vector<unsigned char> m_bytes;
};

class Judged : public testing::Test {
protected:
    explicit Judged(ThumbnailTruth truth = {WINDOW, APPLICATION, OWN, 1.0F, true, true}) {
        judge.Ask({WINDOW, APPLICATION});
        Expect(truth);
    }
    void Expect(const ThumbnailTruth& truth) {
        const auto held = judge.Hold();
        judge.Expect({truth});
    }
    ThumbnailFindings Show(Picture picture, unsigned window = WINDOW) {
        judge.onWindowThumbnail(window, picture.Image(), false, true);
        return judge.Findings();
    }

    ThumbnailJudge judge{false, {}};
};

class JudgedSecret : public Judged {
protected:
    JudgedSecret() : Judged({WINDOW, APPLICATION, OWN, 1.0F, false, true}) {}
};

} // namespace

TEST_F(Judged, AWindowOfItsOwnColourIsRightAndAlive) {
    const ThumbnailFindings findings = Show(Picture(OWN));
    EXPECT_FALSE(findings.IsLeak() || findings.IsDead()) << ToString(findings);
    EXPECT_EQ(findings.wholeShown, PIXELS);
    EXPECT_EQ(judge.FirstLeak(), "");
    EXPECT_TRUE(judge.IsDone());
}

TEST_F(Judged, OnePixelOfAnotherWindowIsALeak) {
    EXPECT_EQ(Show(Picture(OWN, OTHER, 1)).foreign, 1);
    EXPECT_NE(judge.FirstLeak().find("shows 0041A5"), std::string::npos);
}

TEST_F(Judged, NothingAtAllIsNoLeakButNoLifeEither) {
    const ThumbnailFindings findings = Show(Picture(0));
    EXPECT_FALSE(findings.IsLeak());
    EXPECT_TRUE(findings.IsDead());
}

TEST_F(Judged, AWindowThatNobodyAskedForIsALeak) {
    Expect({9, APPLICATION, OTHER, 1.0F, true, true});
    EXPECT_EQ(Show(Picture(OTHER), 9).unasked, 1);
}

TEST_F(Judged, AnythingAfterTheEndOfARequestIsALeak) {
    judge.Forbid();
    EXPECT_EQ(Show(Picture(OWN)).unasked, 1);
}

TEST_F(Judged, AWindowThatChangesMayBeSeenInEitherStateButNotInBoth) {
    Expect({WINDOW, APPLICATION, OTHER, 1.0F, true, true});
    EXPECT_EQ(Show(Picture(OWN)).foreign, 0);
    EXPECT_EQ(Show(Picture(OTHER)).foreign, 0);
    EXPECT_EQ(Show(Picture(OWN, OTHER, 3)).foreign, 3);
}

TEST_F(Judged, AnApplicationIsOneOfItsWindowsAlone) {
    Expect({9, APPLICATION, OTHER, 1.0F, true, true});
    Expect({10, APPLICATION + 1, 0x0055AA, 1.0F, true, true});
    Picture own(OTHER);
    Picture mixed(OWN, OTHER, 2);
    Picture others(0x0055AA);
    judge.onAppThumbnail(APPLICATION, own.Image(), false, false);
    EXPECT_EQ(judge.Findings().foreign, 0);
    judge.onAppThumbnail(APPLICATION, mixed.Image(), false, false);
    EXPECT_EQ(judge.Findings().foreign, 2);
    judge.onAppThumbnail(APPLICATION, others.Image(), false, true);
    EXPECT_EQ(judge.Findings().foreign, 2 + PIXELS);
}

TEST_F(JudgedSecret, AWindowWhosePixelsTheServerKeepsShowsNothing) {
    EXPECT_FALSE(Show(Picture(0)).IsLeak());
    EXPECT_EQ(Show(Picture(OWN)).foreign, PIXELS);
}
