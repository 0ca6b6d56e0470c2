// SPDX-License-Identifier: Apache-2.0
#include "platform/bitmap_font.h"
#include "platform/simulated/scene.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <string_view>

using namespace platform;

namespace {

bool LooksSecret(SimulatedArgb argb) {
    return platform::LooksSecret(static_cast<std::uint8_t>(argb >> 16), static_cast<std::uint8_t>(argb >> 8),
                                 static_cast<std::uint8_t>(argb));
}

int SecretPixelsOf(const SimulatedContent& content, const CGSize& size) {
    int count = 0;
    for (int y = 0; y < static_cast<int>(size.height); ++y) {
        for (int x = 0; x < static_cast<int>(size.width); ++x)
            count += LooksSecret(content.At(x, y, 7)) ? 1 : 0;
    }
    return count;
}

int InkOf(std::string_view text) {
    int count = 0;
    for (int y = 0; y < BITMAP_FONT_HEIGHT; ++y) {
        for (int x = 0; x < BITMAP_FONT_WIDTH; ++x)
            count += HasInk(text, x, y) ? 1 : 0;
    }
    return count;
}

} // namespace

TEST(DemoScene, HasRedInTheSecretWindowAndNowhereElse) {
    const DemoScene scene = MakeDemoScene();
    for (const SimulatedWindow& window : scene.desktop.windows) {
        const CGSize& size = window.info.frame.size;
        const int all = static_cast<int>(size.width) * static_cast<int>(size.height);
        EXPECT_EQ(SecretPixelsOf(window.content, size), window.info.id == scene.secret ? all : 0)
            << window.info.title;
    }
    for (const SimulatedDisplay& display : scene.desktop.displays)
        EXPECT_EQ(SecretPixelsOf(display.background, {10, 10}), 0);
    const SimulatedCursor::Representation& cursor = scene.desktop.cursor->representations.front();
    EXPECT_EQ(
        SecretPixelsOf(cursor.content, {static_cast<float>(cursor.width), static_cast<float>(cursor.height)}),
        0);
}

TEST(DemoScene, HasTheSecretInFrontOfTheSharedApplication) {
    DemoScene scene = MakeDemoScene();
    const CGRect secret = FindWindow(scene.desktop, scene.secret)->info.frame;
    EXPECT_NE(FindWindow(scene.desktop, scene.secret)->info.owner, scene.shared);
    EXPECT_EQ(FindWindow(scene.desktop, scene.secret)->info.sharing, SharingState::ReadOnly)
        << "it would be left out of the screen's picture, too";
    bool isSecretPassed = false;
    int shared = 0;
    int covered = 0;
    int onBoth = 0;
    for (const SimulatedWindow& window : scene.desktop.windows) {
        const CGRect& frame = window.info.frame;
        isSecretPassed = isSecretPassed || window.info.id == scene.secret;
        if (window.info.owner != scene.shared)
            continue;
        ++shared;
        EXPECT_TRUE(isSecretPassed) << window.info.title << " is in front of the secret";
        covered +=
            frame.origin.x < secret.origin.x && secret.origin.x < frame.origin.x + frame.size.width ? 1 : 0;
        onBoth += frame.origin.x < 1280 && frame.origin.x + frame.size.width > 1280 ? 1 : 0;
    }
    EXPECT_EQ(shared, 2);
    EXPECT_EQ(covered, 1);
    EXPECT_EQ(onBoth, 1);
}

TEST(BitmapFont, HasInkInEachCharacterButTheSpace) {
    for (char character = '!'; character <= '~'; ++character)
        EXPECT_GT(InkOf(std::string_view(&character, 1)), 3) << character;
    EXPECT_EQ(InkOf(" "), 0);
}

TEST(BitmapFont, StandsUpright) {
    // The stem of an L is left and its foot below.
    EXPECT_TRUE(HasInk("L", 2, 6));
    EXPECT_FALSE(HasInk("L", 7, 6));
    EXPECT_TRUE(HasInk("L", 6, 15) || HasInk("L", 6, 14));
    EXPECT_EQ(HasInk("xL", BITMAP_FONT_WIDTH + 2, 6), HasInk("L", 2, 6));
}

TEST(BitmapFont, HasNoInkOutsideTheLine) {
    for (int i = -300; i < 300; ++i) {
        EXPECT_FALSE(HasInk("##", -1 - (i + 300), 8));
        EXPECT_FALSE(HasInk("##", 2 * BITMAP_FONT_WIDTH + i + 300, 8));
        EXPECT_FALSE(HasInk("##", 5, BITMAP_FONT_HEIGHT + i + 300));
        EXPECT_FALSE(HasInk("##", 5, -1 - (i + 300)));
    }
    EXPECT_FALSE(HasInk("", 0, 0));
}

TEST(BitmapFont, ShowsAQuestionMarkForWhatItDoesNotHave) {
    for (const std::string_view unknown : {"\n", "\x7F", "\xC3", "\xFF"}) {
        for (int y = 0; y < BITMAP_FONT_HEIGHT; ++y) {
            for (int x = 0; x < BITMAP_FONT_WIDTH; ++x)
                EXPECT_EQ(HasInk(unknown, x, y), HasInk("?", x, y));
        }
    }
}
