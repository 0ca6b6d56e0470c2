// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_util_mac.h"
#include "src/share_region.h"
#include "tests/src/share_frame_tools.h"
#include "tests/support/trace_log.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <cstddef>
#include <filesystem>
#include <fstream>
#include <memory>
#include <string>
#include <vector>

/// Frames that are filled, and images as files and texts. The cursor has a file of its own.

namespace {

constexpr int WIDTH = 12;
constexpr int HEIGHT = 8;
constexpr int COLOUR = 0x804020;
const Bytes RGBA_COLOUR{0x80, 0x40, 0x20, 255};
const Bytes ARGB_COLOUR{255, 0x80, 0x40, 0x20};
const Bytes NOTHING(4, 0);

Held<> Frame(SHARE_FRAME_FORMAT format = SHARE_FRAME_FORMAT_RGBA) {
    return NewFrame(WIDTH, HEIGHT, format);
}

Bytes PixelAt(IShareFrame& frame, int x, int y) {
    const unsigned char* const pixel = frame.GetFrameLineData(y) + x * 4;
    return {pixel, pixel + 4};
}

/// Everything inside the rectangles has the colour, and everything outside has none.
void ExpectFilled(IShareFrame& frame, const std::vector<TVLRect>& rects, const Bytes& colour = RGBA_COLOUR) {
    for (int y = 0; y < HEIGHT; ++y) {
        for (int x = 0; x < WIDTH; ++x) {
            const bool isInside = std::any_of(rects.begin(), rects.end(), [=](const TVLRect& rect) {
                return x >= rect.left && x < rect.right && y >= rect.top && y < rect.bottom;
            });
            ASSERT_EQ(PixelAt(frame, x, y), isInside ? colour : NOTHING) << x << "," << y;
        }
    }
}

int Fill(IShareFrame& frame, const std::vector<TVLRect>& rects, int colour = COLOUR) {
    TVLRegion region;
    for (const TVLRect& rect : rects)
        region.AddRect(rect);
    return ShareUtilMac::FillFrame(&frame, colour, &region);
}

platform::CGImageRef Image(int width, int height) {
    const auto memory = std::make_shared<Bytes>(static_cast<std::size_t>(width * height) * 4, 255);
    return platform::CGImageCreate(width, height, static_cast<std::size_t>(width) * 4,
                                   platform::CGPixelLayout::RGBA, memory->data(), memory);
}

class ImageFiles : public testing::Test {
protected:
    ImageFiles()
        : folder(std::filesystem::path(testing::TempDir()) / ("share_util_mac_" + std::to_string(getpid()))) {
        std::filesystem::create_directories(folder);
    }
    ~ImageFiles() override { std::filesystem::remove_all(folder); }

    std::string Path(const char* name) const { return (folder / name).string(); }

    const std::filesystem::path folder;
};

} // namespace

// ---- FillFrame

TEST(FillFrame, RefusesAFrameThatIsNoneOrHasNoPixels) {
    EXPECT_EQ(ShareUtilMac::FillFrame(nullptr, COLOUR, nullptr), -2);
    EXPECT_EQ(ShareUtilMac::FillFrame(NewFrame(0, 8, SHARE_FRAME_FORMAT_RGBA).get(), COLOUR, nullptr), -2);
    EXPECT_EQ(ShareUtilMac::FillFrame(NewFrame(8, 0, SHARE_FRAME_FORMAT_RGBA).get(), COLOUR, nullptr), -2);
}

TEST(FillFrame, RefusesOtherFormatsAndPaintsNothing) {
    for (const SHARE_FRAME_FORMAT format :
         {SHARE_FRAME_FORMAT_NONE, SHARE_FRAME_FORMAT_RGB, SHARE_FRAME_FORMAT_BGRA, SHARE_FRAME_FORMAT_ABGR,
          SHARE_FRAME_FORMAT_BGR}) {
        const auto frame = Frame(format);
        EXPECT_EQ(ShareUtilMac::FillFrame(frame.get(), COLOUR, nullptr), -2) << format;
        const auto length = static_cast<std::size_t>(frame->GetFrameDataLen());
        EXPECT_EQ(FirstBytes(*frame, length), Bytes(length, 0)) << format;
    }
}

TEST(FillFrame, FillsTheWholeFrameWithoutARegion) {
    const auto frame = Frame();
    EXPECT_EQ(ShareUtilMac::FillFrame(frame.get(), COLOUR, nullptr), 0);
    ExpectFilled(*frame, {{0, 0, WIDTH, HEIGHT}});
}

TEST(FillFrame, FailsForAnEmptyRegion) {
    const auto frame = Frame();
    EXPECT_EQ(Fill(*frame, {}), -1);
    ExpectFilled(*frame, {});
}

TEST(FillFrame, FillsEachRectangleOfTheRegionTopDown) {
    const auto frame = Frame();
    const std::vector<TVLRect> rects{{0, 0, 3, 2}, {5, 1, 9, 7}, {11, 7, 12, 8}};
    EXPECT_EQ(Fill(*frame, rects), 0);
    ExpectFilled(*frame, rects);
}

TEST(FillFrame, PutsAnOpaqueColourInTheOrderOfTheFrame) {
    const auto frame = Frame(SHARE_FRAME_FORMAT_ARGB);
    EXPECT_EQ(Fill(*frame, {{1, 1, 4, 4}}), 0);
    ExpectFilled(*frame, {{1, 1, 4, 4}}, ARGB_COLOUR);
}

TEST(FillFrame, TakesTheThirdByteForRedInBothFormats) {
    const auto rgba = Frame(SHARE_FRAME_FORMAT_RGBA);
    const auto argb = Frame(SHARE_FRAME_FORMAT_ARGB);
    EXPECT_EQ(ShareUtilMac::FillFrame(rgba.get(), 0xFF0000, nullptr), 0);
    EXPECT_EQ(ShareUtilMac::FillFrame(argb.get(), 0xFF0000, nullptr), 0);
    EXPECT_EQ(PixelAt(*rgba, 3, 3), (Bytes{255, 0, 0, 255}));
    EXPECT_EQ(PixelAt(*argb, 3, 3), (Bytes{255, 255, 0, 0}));
}

TEST(FillFrame, LooksAtThreeBytesOfTheColour) {
    const auto frame = Frame();
    EXPECT_EQ(ShareUtilMac::FillFrame(frame.get(), -1, nullptr), 0);
    EXPECT_EQ(PixelAt(*frame, 0, 0), Bytes(4, 255));
    EXPECT_EQ(ShareUtilMac::FillFrame(frame.get(), 0x7F804020, nullptr), 0);
    EXPECT_EQ(PixelAt(*frame, 0, 0), RGBA_COLOUR);
}

TEST(FillFrame, GivesEachShadeItsOwnByte) {
    const auto frame = Frame();
    for (int shade = 0; shade < 256; ++shade) {
        EXPECT_EQ(ShareUtilMac::FillFrame(frame.get(), shade << 16 | shade << 8 | shade, nullptr), 0);
        EXPECT_EQ(PixelAt(*frame, 5, 5)[0], shade);
    }
}

TEST(FillFrame, LeavesOffWhatLiesOutside) {
    const auto frame = Frame();
    EXPECT_EQ(Fill(*frame, {{-5, -5, 2, 2}, {10, 6, 100, 100}, {-3000000, 3, 3000000, 4}}), 0);
    ExpectFilled(*frame, {{0, 0, 2, 2}, {10, 6, WIDTH, HEIGHT}, {0, 3, WIDTH, 4}});
}

TEST(FillFrame, SucceedsWhenAllLiesOutside) {
    const auto frame = Frame();
    for (const TVLRect rect :
         {TVLRect{-9, 0, 0, 8}, TVLRect{12, 0, 20, 8}, TVLRect{0, -9, 12, 0}, TVLRect{0, 8, 12, 20}}) {
        EXPECT_EQ(Fill(*frame, {rect}), 0);
        ExpectFilled(*frame, {});
    }
}

TEST(FillFrame, LeavesAFrameAloneThatHasLessMemoryThanPixels) {
    const Held<> frame = NewFrame(WIDTH, HEIGHT, SHARE_FRAME_FORMAT_NONE);
    ASSERT_EQ(frame->SetFrameLineBytes(WIDTH * 3), 0);
    frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA); // memory for the short lines
    frame->Reset();                                     // the lines are whole again, the memory is not
    ASSERT_EQ(frame->GetFrameDataLen(), WIDTH * HEIGHT * 4);
    EXPECT_EQ(ShareUtilMac::FillFrame(&*frame, COLOUR, nullptr), -1);
    EXPECT_EQ(Bytes(frame->GetFrameData(), frame->GetFrameData() + WIDTH * 3 * HEIGHT),
              Bytes(WIDTH * 3 * HEIGHT, 0));
}

TEST(FillFrame, KeepsToTheLinesOfTheFrame) {
    const auto frame = Frame();
    frame->SetFrameLineBytes(WIDTH * 4 + 8);
    EXPECT_EQ(ShareUtilMac::FillFrame(frame.get(), COLOUR, nullptr), 0);
    ExpectFilled(*frame, {{0, 0, WIDTH, HEIGHT}});
    EXPECT_EQ(Part(FirstBytes(*frame, WIDTH * 4 + 8), WIDTH * 4, 8), Bytes(8, 0)) << "the gap is no pixel";
}

TEST(FillFrame, FailsWhereMemoryIsTooShort) {
    const auto frame = Frame();
    frame->SetFrameLineBytes(WIDTH * 3);
    EXPECT_EQ(ShareUtilMac::FillFrame(frame.get(), COLOUR, nullptr), -1);
    const auto without = Frame();
    Bytes pixels(WIDTH * HEIGHT * 4);
    without->SetExternalBuf(pixels.data(), Length(pixels));
    without->SetExternalBuf(nullptr, 0);
    EXPECT_EQ(ShareUtilMac::FillFrame(without.get(), COLOUR, nullptr), -1);
}

// ---- Images as files and texts

TEST_F(ImageFiles, AreWrittenAsPNG) {
    ASSERT_TRUE(ShareUtilMac::CGImageWriteToFile(Image(3, 2), Path("image.png").c_str()));
    std::ifstream file(Path("image.png"), std::ios::binary);
    char start[24]{};
    file.read(start, sizeof start);
    ASSERT_TRUE(file.good());
    EXPECT_EQ(std::string(start, 8), "\x89PNG\r\n\x1a\n");
    EXPECT_EQ(std::string(start + 16, 8), std::string("\0\0\0\3\0\0\0\2", 8)) << "the size in the header";
}

TEST_F(ImageFiles, AreRefusedForNullWithoutATrace) {
    const CTraceLog trace;
    EXPECT_FALSE(ShareUtilMac::CGImageWriteToFile(nullptr, Path("image.png").c_str()));
    EXPECT_FALSE(ShareUtilMac::CGImageWriteToFile(Image(3, 2), nullptr));
    EXPECT_TRUE(trace.Lines().empty());
    EXPECT_TRUE(std::filesystem::is_empty(folder));
}

TEST_F(ImageFiles, ThatCannotBeWrittenAreTracedWithTheirPath) {
    const CTraceLog trace;
    const std::string path = Path("no such folder") + "/image.png";
    EXPECT_FALSE(ShareUtilMac::CGImageWriteToFile(Image(3, 2), path.c_str()));
    ASSERT_EQ(trace.Lines().size(), 1u);
    EXPECT_NE(trace.Lines()[0].find("ERROR: CGImageWriteToFile"), std::string::npos);
    EXPECT_NE(trace.Lines()[0].find(path), std::string::npos);
}

TEST(ImageText, TellsTheSize) {
    EXPECT_EQ(ShareUtilMac::CGImageToString(nullptr), "null");
    EXPECT_EQ(ShareUtilMac::CGImageToString(Image(30, 2)), "{w=30 h=2}");
}
