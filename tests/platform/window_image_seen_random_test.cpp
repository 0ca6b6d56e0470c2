// SPDX-License-Identifier: Apache-2.0
#include "platform/simulated/scene.h"
#include "platform/window_image_layers.h"
#include "tests/platform/bitmap_tools.h"
#include "tests/support/test_effort.h"

#include <gtest/gtest.h>

#include <array>
#include <cstring>
#include <iostream>
#include <memory>
#include <random>
#include <vector>

// Images of windows are drawn only where each window is seen: with the same result as one window on top of
// the other.

using namespace platform;

namespace {

constexpr int WIDTH = 420;
constexpr int HEIGHT = 300;
constexpr int COARSE = 300; // so far reaches the display of scale 1
constexpr std::size_t BYTES = std::size_t{WIDTH} * HEIGHT * 4;
constexpr unsigned SEED = 4711;

class CRandomWindows {
public:
    int Between(int low, int high) {
        return low + static_cast<int>(m_random() % static_cast<unsigned>(high - low + 1));
    }

    /// Windows of noise, some translucent, some of the other display's scale.
    std::shared_ptr<SimulatedWindowServer> Serve(int windows) {
        Scene scene;
        scene.Display(0, 0, COARSE, HEIGHT).Display(COARSE, 0, WIDTH - COARSE, HEIGHT).Scale(2);
        for (int id = 1; id <= windows; ++id) {
            using enum PixelFormat;
            constexpr std::array FORMATS{BGRX, BGRX, BGRX, BGRA, RGBX, X2R10G10B10};
            // The fine ones lie wholly on the display of scale 2.
            const bool isFine = Between(1, 3) == 1;
            const CGRect frame =
                isFine ? Rect(Between(COARSE, WIDTH - 60), Between(0, 100), Between(10, 60), Between(10, 200))
                       : Rect(Between(-60, COARSE - 40), Between(-60, HEIGHT - 40), Between(30, COARSE),
                              Between(30, HEIGHT));
            scene.Window(static_cast<CGWindowID>(id))
                .At(frame.origin.x, frame.origin.y, frame.size.width, frame.size.height)
                .Format(FORMATS[static_cast<std::size_t>(Between(0, FORMATS.size() - 1))])
                .Alpha(Between(1, 6) == 1 ? 0.5F : 1.0F)
                .Showing(Noise());
        }
        return scene.Serve();
    }

private:
    static CGRect Rect(int x, int y, int width, int height) {
        return {{static_cast<float>(x), static_cast<float>(y)},
                {static_cast<float>(width), static_cast<float>(height)}};
    }
    SimulatedContent Noise() {
        const auto seed = static_cast<SimulatedArgb>(m_random());
        const SimulatedArgb least = Between(1, 3) == 1 ? 0 : 0xFF000000;
        return SimulatedContent::Painted([seed, least](int x, int y) {
            const auto at = static_cast<SimulatedArgb>(y * 1000 + x);
            return ((at ^ seed) * 2654435761U) | least;
        });
    }

    std::mt19937 m_random{SEED};
};

class CPixels {
public:
    CPixels() : m_bytes(BYTES, 0x11), m_context(Make()) {
        CGContextSetInterpolationQuality(m_context.get(), kCGInterpolationHigh);
    }
    CGContext* Get() const { return m_context.get(); }
    bool operator==(const CPixels& other) const { return m_bytes == other.m_bytes; }

private:
    CGContextRef Make() {
        return CGBitmapContextCreate(m_bytes.data(), BYTES, WIDTH, HEIGHT, 8, WIDTH * 4,
                                     kCGImageAlphaNoneSkipLast);
    }

    std::vector<std::uint8_t> m_bytes;
    CGContextRef m_context;
};

void DrawOneOnTopOfTheOther(CGContext* context, const CGRect& place, const CGWindowImage& image) {
    CGContextClipToRect(context, place);
    for (const WindowLayer& layer : image.layers) {
        CGContextSetAlpha(context, layer.alpha);
        EXPECT_TRUE(CGContextDrawImage(context, PlaceOfLayer(layer, image, place), layer.image.get()));
    }
}

} // namespace

TEST(WindowImageSeen, IsDrawnAsOneWindowOnTopOfTheOther) {
    const int rounds = TestRounds(200);
    CRandomWindows windows;
    int scaled = 0;
    for (int round = 0; round < rounds; ++round) {
        const int count = windows.Between(2, 12);
        const auto former = ReplaceWindowServer(windows.Serve(count));
        std::vector<CGWindowID> all;
        for (int id = 1; id <= count; ++id)
            all.push_back(static_cast<CGWindowID>(id));
        const bool isWhole = windows.Between(1, 5) != 1;
        const CGRect place = isWhole ? CGRect{{0, 0}, {WIDTH, HEIGHT}} : CGRect{{20, 10}, {300, 270}};
        const CGWindowImageRef image =
            CGWindowListTakeImage({{0, 0}, {WIDTH, HEIGHT}}, all, kCGWindowImageBoundsIgnoreFraming, true);
        ReplaceWindowServer(former);
        ASSERT_NE(image, nullptr);
        for (const WindowLayer& layer : image->layers)
            scaled += layer.picture->scale != 1 || !isWhole ? 1 : 0;
        const CPixels seen;
        const CPixels plain;
        EXPECT_TRUE(CGContextDrawWindowImage(seen.Get(), place, image.get()));
        DrawOneOnTopOfTheOther(plain.Get(), place, *image);
        ASSERT_TRUE(seen == plain) << "round " << round;
    }
    std::cout << rounds << " images, seed " << SEED << ", " << scaled << " windows scaled\n";
    EXPECT_GT(scaled, rounds / 8);
}
