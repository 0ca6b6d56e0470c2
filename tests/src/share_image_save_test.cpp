// SPDX-License-Identifier: Apache-2.0
#include "src/share_image_save.h"
#include "tests/platform/image_files.h"
#include "tests/src/share_frame_tools.h"

#include <gtest/gtest.h>
#include <sys/resource.h>

#include <algorithm>
#include <array>
#include <csignal>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <string>

/// Pictures saved to files: what is written, what is refused, and what is told.

namespace {

namespace fs = std::filesystem;

constexpr std::array<SHARE_FRAME_FORMAT, 3> IMAGE_FORMATS{SHARE_FRAME_FORMAT_RGBA, SHARE_FRAME_FORMAT_ARGB,
                                                          SHARE_FRAME_FORMAT_RGB};

CGPixelLayout LayoutOf(SHARE_FRAME_FORMAT format) {
    switch (format) {
        case SHARE_FRAME_FORMAT_ARGB:
            return CGPixelLayout::ARGB;
        case SHARE_FRAME_FORMAT_RGB:
            return CGPixelLayout::RGB;
        default:
            return CGPixelLayout::RGBA;
    }
}

Colour Ramp(int x, int y) {
    return {x * 6 % 256, y * 9 % 256, 255 - x * 3 % 256, 255};
}

/// Pixels in the lines of a frame; what is behind the pixels of a line is 0xEE.
Bytes Lines(int width, int height, int lineBytes, SHARE_FRAME_FORMAT format,
            Colour (*colourAt)(int, int) = Ramp) {
    Bytes lines(static_cast<std::size_t>(lineBytes) * static_cast<std::size_t>(height), std::uint8_t{0xEE});
    const CGPixelLayout layout = LayoutOf(format);
    for (int y = 0; y < height; ++y) {
        for (int x = 0; x < width; ++x)
            WritePixel(layout,
                       &lines[static_cast<std::size_t>(y * lineBytes) +
                              static_cast<std::size_t>(x) * platform::CGBytesPerPixel(layout)],
                       colourAt(x, y));
    }
    return lines;
}

Held<> RampFrame(int width, int height, SHARE_FRAME_FORMAT format, int lineBytes = 0) {
    auto frame = NewFrame(width, height, format);
    if (lineBytes != 0)
        frame->SetFrameLineBytes(lineBytes);
    const Bytes lines = Lines(width, height, frame->GetFrameLineBytes(), format);
    EXPECT_EQ(frame->WriteFrameData(lines.data(), Length(lines)), Length(lines));
    return frame;
}

std::uint32_t LittleEndian(const Bytes& file, std::size_t at, std::size_t bytes) {
    std::uint32_t value = 0;
    for (std::size_t i = bytes; i-- > 0;)
        value = value << 8 | file[at + i];
    return value;
}

class ImageSave : public testing::Test {
protected:
    TemporaryFolder m_folder;
    const std::string m_path = m_folder / "picture";
};

using SaveBmp = ImageSave;
using SaveJpeg = ImageSave;
using SavePng = ImageSave;

class DocumentDir : public testing::Test {
protected:
    DocumentDir() {
        setenv("HOME", "/home/user", 1);
        setenv("XDG_CONFIG_HOME", "/nonexistent", 1);
    }
    const std::string m_expected = "/home/user/Documents";
};

} // namespace

// ---- Bitmaps

TEST_F(SaveBmp, WritesEveryFieldOfTheHeader) {
    Bytes lines = Lines(300, 2, 1200, SHARE_FRAME_FORMAT_RGBA);
    ASSERT_TRUE(SaveRawDataToBmp(lines.data(), 300, 2, 0, SHARE_FRAME_FORMAT_RGBA, m_path.c_str()));
    const Bytes file = ReadWholeFile(m_path);
    ASSERT_EQ(file.size(), 54u + 1800u);
    EXPECT_EQ(file[0], 'B');
    EXPECT_EQ(file[1], 'M');
    EXPECT_EQ(LittleEndian(file, 2, 4), 1854u);
    EXPECT_EQ(LittleEndian(file, 6, 4), 0u);
    EXPECT_EQ(LittleEndian(file, 10, 4), 54u);
    EXPECT_EQ(LittleEndian(file, 14, 4), 40u);
    EXPECT_EQ(LittleEndian(file, 18, 4), 300u);
    EXPECT_EQ(LittleEndian(file, 22, 4), 2u);
    EXPECT_EQ(LittleEndian(file, 26, 2), 1u);
    EXPECT_EQ(LittleEndian(file, 28, 2), 24u);
    for (std::size_t at = 30; at < 54; at += 4)
        EXPECT_EQ(LittleEndian(file, at, 4), 0u) << at;
}

TEST_F(SaveBmp, LeavesThePaddingOutOfTheFileSize) {
    Bytes lines{1, 2, 3, 4, 5, 6, 7, 8, 9};
    ASSERT_TRUE(SaveRawDataToBmp(lines.data(), 3, 1, 0, SHARE_FRAME_FORMAT_RGB, m_path.c_str()));
    const Bytes file = ReadWholeFile(m_path);
    ASSERT_EQ(file.size(), 54u + 9u + 3u);
    EXPECT_EQ(LittleEndian(file, 2, 4), 63u);
    EXPECT_EQ(Part(file, 54, 12), (Bytes{1, 2, 3, 4, 5, 6, 7, 8, 9, 0, 0, 0}));
}

TEST_F(SaveBmp, BeginsWithTheLastLine) {
    Bytes lines = Pattern(32);
    ASSERT_TRUE(SaveRawDataToBmp(lines.data(), 4, 2, 0, SHARE_FRAME_FORMAT_RGBA, m_path.c_str()));
    const Bytes file = ReadWholeFile(m_path);
    ASSERT_EQ(file.size(), 54u + 24u);
    for (std::size_t row = 0; row < 2; ++row) {
        for (std::size_t x = 0; x < 4; ++x)
            EXPECT_EQ(Part(file, 54 + row * 12 + x * 3, 3), Part(lines, (1 - row) * 16 + x * 4, 3))
                << "the channels keep their order and the fourth byte is dropped";
    }
}

TEST_F(SaveBmp, SkipsTheRestOfLongerLines) {
    for (const SHARE_FRAME_FORMAT format : {SHARE_FRAME_FORMAT_RGBA, SHARE_FRAME_FORMAT_RGB}) {
        const int tight = format == SHARE_FRAME_FORMAT_RGBA ? 16 : 12;
        Bytes dense = Lines(4, 3, tight, format);
        Bytes spaced = Lines(4, 3, 32, format);
        ASSERT_TRUE(SaveRawDataToBmp(dense.data(), 4, 3, 0, format, m_path.c_str()));
        const Bytes expected = ReadWholeFile(m_path);
        ASSERT_TRUE(SaveRawDataToBmp(spaced.data(), 4, 3, 32, format, m_path.c_str()));
        EXPECT_EQ(ReadWholeFile(m_path), expected);
    }
}

TEST_F(SaveBmp, PadsEveryRowToFourBytes) {
    for (int width = 1; width < 6; ++width) {
        Bytes lines = Lines(width, 2, width * 4, SHARE_FRAME_FORMAT_RGBA);
        ASSERT_TRUE(SaveRawDataToBmp(lines.data(), width, 2, 0, SHARE_FRAME_FORMAT_RGBA, m_path.c_str()));
        EXPECT_EQ(fs::file_size(m_path), static_cast<std::size_t>(54 + (width * 3 + 3) / 4 * 4 * 2));
    }
}

TEST_F(SaveBmp, MakesNoFileOfWhatItDoesNotTake) {
    Bytes lines(64);
    unsigned char* const data = lines.data();
    const char* const path = m_path.c_str();
    for (const int format : {0, 2, 4, 5, 6, 7, -1})
        EXPECT_FALSE(SaveRawDataToBmp(data, 2, 2, 0, static_cast<SHARE_FRAME_FORMAT>(format), path))
            << format;
    EXPECT_FALSE(SaveRawDataToBmp(data, 0, 2, 0, SHARE_FRAME_FORMAT_RGBA, path));
    EXPECT_FALSE(SaveRawDataToBmp(data, 2, 0, 0, SHARE_FRAME_FORMAT_RGBA, path));
    EXPECT_FALSE(SaveRawDataToBmp(data, -2, 2, 0, SHARE_FRAME_FORMAT_RGBA, path));
    EXPECT_FALSE(SaveRawDataToBmp(data, 2, -2, 0, SHARE_FRAME_FORMAT_RGBA, path));
    EXPECT_FALSE(SaveRawDataToBmp(nullptr, 2, 2, 0, SHARE_FRAME_FORMAT_RGBA, path));
    EXPECT_FALSE(SaveRawDataToBmp(data, 2, 2, 0, SHARE_FRAME_FORMAT_RGBA, nullptr));
    EXPECT_FALSE(
        SaveRawDataToBmp(data, 2, 2, 0, SHARE_FRAME_FORMAT_RGBA, (m_folder / "absent/picture").c_str()));
    EXPECT_EQ(m_folder.CountFiles(), 0u);
}

TEST_F(SaveBmp, DoesNotLookAtWhetherItsWritesSucceed) {
    Bytes lines(64);
    EXPECT_TRUE(SaveRawDataToBmp(lines.data(), 4, 4, 0, SHARE_FRAME_FORMAT_RGBA, "/dev/full"));
}

// ---- Images

TEST(RawDataToImage, CopiesFormatsOneToThree) {
    for (const SHARE_FRAME_FORMAT format : IMAGE_FORMATS) {
        Bytes lines = Lines(5, 3, 24, format);
        const platform::CGImageRef image = RawDataToImage(lines.data(), 5, 3, 24, format);
        std::fill(lines.begin(), lines.end(), std::uint8_t{0});
        ASSERT_NE(image, nullptr);
        EXPECT_EQ(platform::CGImageGetWidth(image.get()), 5);
        EXPECT_EQ(platform::CGImageGetHeight(image.get()), 3);
        for (int y = 0; y < 3; ++y) {
            for (int x = 0; x < 5; ++x)
                EXPECT_EQ(PixelOf(*image, x, y), Ramp(x, y)) << format;
        }
    }
}

TEST(RawDataToImage, RefusesOtherFormatsAndMissingData) {
    Bytes lines(64);
    for (const int format : {0, 4, 5, 6, 7, -1})
        EXPECT_EQ(RawDataToImage(lines.data(), 2, 2, 8, static_cast<SHARE_FRAME_FORMAT>(format)), nullptr);
    EXPECT_EQ(RawDataToImage(nullptr, 2, 2, 8, SHARE_FRAME_FORMAT_RGBA), nullptr);
}

TEST(RawDataToImage, RefusesLinesThatDoNotHoldTheirPixels) {
    Bytes lines(64);
    EXPECT_EQ(RawDataToImage(lines.data(), 2, 2, 7, SHARE_FRAME_FORMAT_RGBA), nullptr);
    EXPECT_EQ(RawDataToImage(lines.data(), 2, 2, 0, SHARE_FRAME_FORMAT_RGBA), nullptr);
    EXPECT_EQ(RawDataToImage(lines.data(), 2, 2, -8, SHARE_FRAME_FORMAT_RGBA), nullptr);
    EXPECT_EQ(RawDataToImage(lines.data(), 2, 2, 5, SHARE_FRAME_FORMAT_RGB), nullptr);
    EXPECT_NE(RawDataToImage(lines.data(), 2, 2, 6, SHARE_FRAME_FORMAT_RGB), nullptr);
    EXPECT_EQ(RawDataToImage(lines.data(), 0, 2, 8, SHARE_FRAME_FORMAT_RGBA), nullptr);
    EXPECT_EQ(RawDataToImage(lines.data(), 2, -1, 8, SHARE_FRAME_FORMAT_RGBA), nullptr);
}

TEST(ShareFrameToImage, ShowsTheFrame) {
    const auto frame = RampFrame(7, 5, SHARE_FRAME_FORMAT_ARGB, 40);
    const platform::CGImageRef image = ShareFrameToImage(frame.get());
    ASSERT_NE(image, nullptr);
    EXPECT_EQ(PixelOf(*image, 6, 4), Ramp(6, 4));
}

TEST(ShareFrameToImage, RefusesNullAndFramesWithoutAPicture) {
    EXPECT_EQ(ShareFrameToImage(nullptr), nullptr);
    EXPECT_EQ(ShareFrameToImage(NewFrame<>().get()), nullptr);
    EXPECT_EQ(ShareFrameToImage(NewFrame(0, 4, SHARE_FRAME_FORMAT_RGBA).get()), nullptr);
    EXPECT_EQ(ShareFrameToImage(NewFrame(4, 4, SHARE_FRAME_FORMAT_NONE).get()), nullptr);
    EXPECT_EQ(ShareFrameToImage(NewFrame(4, 4, SHARE_FRAME_FORMAT_BGRA).get()), nullptr);
    // Its length in bytes does not fit into 32 bits.
    Bytes memory(64);
    const auto huge = NewFrame<>();
    huge->SetExternalBuf(memory.data(), Length(memory));
    huge->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    huge->SetFrameSize(1 << 20, 1 << 20);
    ASSERT_EQ(huge->GetFrameLineBytes(), 1 << 22);
    EXPECT_EQ(ShareFrameToImage(huge.get()), nullptr);
}

TEST(ShareFrameToImage, ReadsNoMoreThanAFrameHasAfterAReset) {
    const auto frame = NewFrame<>();
    frame->SetFrameLineBytes(300);
    frame->SetFrameSize(100, 100);
    frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    Bytes white(30'000, 255);
    ASSERT_EQ(frame->WriteFrameData(white.data(), Length(white)), Length(white));
    frame->Reset(); // lines of 400 bytes from now on, on the same memory
    const platform::CGImageRef image = ShareFrameToImage(frame.get());
    ASSERT_NE(image, nullptr);
    EXPECT_EQ(PixelOf(*image, 99, 74), (Colour{255, 255, 255, 255}));
    EXPECT_EQ(PixelOf(*image, 0, 75), (Colour{0, 0, 0, 0}));
}

// ---- PNG

TEST_F(SavePng, WritesEveryPixelOfFormatsOneToThree) {
    for (const SHARE_FRAME_FORMAT format : IMAGE_FORMATS) {
        const auto frame = RampFrame(33, 17, format, 140);
        ASSERT_TRUE(SaveFrameToPNG(frame.get(), m_path.c_str()));
        const DecodedImage decoded = DecodePng(ReadWholeFile(m_path));
        ASSERT_EQ(decoded.width, 33);
        ASSERT_EQ(decoded.height, 17);
        EXPECT_EQ(decoded.hasAlpha, format != SHARE_FRAME_FORMAT_RGB);
        for (int y = 0; y < 17; ++y) {
            for (int x = 0; x < 33; ++x)
                ASSERT_EQ(decoded.At(x, y), Ramp(x, y)) << format << " " << x << "," << y;
        }
    }
    EXPECT_EQ(m_folder.CountFiles(), 1u);
}

TEST_F(SavePng, TakesTheColoursAsPremultiplied) {
    const auto frame = NewFrame(1, 1, SHARE_FRAME_FORMAT_ARGB);
    const Bytes pixel{128, 100, 50, 0};
    frame->WriteFrameData(pixel.data(), 4);
    ASSERT_TRUE(SaveFrameToPNG(frame.get(), m_path.c_str()));
    EXPECT_EQ(DecodePng(ReadWholeFile(m_path)).At(0, 0), (Colour{199, 100, 0, 128}));
}

TEST_F(SavePng, RefusesWhatIsNoImage) {
    EXPECT_FALSE(SaveFrameToPNG(nullptr, m_path.c_str()));
    EXPECT_FALSE(SaveFrameToPNG(NewFrame(4, 4, SHARE_FRAME_FORMAT_NONE).get(), m_path.c_str()));
    EXPECT_FALSE(SaveFrameToPNG(NewFrame(4, 4, SHARE_FRAME_FORMAT_BGRA).get(), m_path.c_str()));
    EXPECT_FALSE(SaveFrameToPNG(nullptr, nullptr));
    EXPECT_EQ(m_folder.CountFiles(), 0u);
}

TEST_F(SavePng, TellsTrueForAnImageThatCouldNotBeWritten) {
    const auto frame = RampFrame(4, 4, SHARE_FRAME_FORMAT_RGBA);
    EXPECT_TRUE(SaveFrameToPNG(frame.get(), nullptr));
    EXPECT_TRUE(SaveFrameToPNG(frame.get(), (m_folder / "absent/picture").c_str()));
    EXPECT_EQ(m_folder.CountFiles(), 0u);
}

TEST_F(SavePng, KeepsTheOldFileOnAFullDisk) {
    WriteWholeFile(m_path, "old");
    const auto frame = NewFrame(100, 100, SHARE_FRAME_FORMAT_RGB);
    std::uint32_t state = 1;
    for (int i = 0; i < frame->GetFrameDataLen(); ++i)
        frame->GetFrameData()[i] = static_cast<unsigned char>((state = state * 1664525 + 1013904223) >> 24);
    const auto handler = std::signal(SIGXFSZ, SIG_IGN);
    rlimit before{};
    getrlimit(RLIMIT_FSIZE, &before);
    const rlimit full{4096, before.rlim_max};
    setrlimit(RLIMIT_FSIZE, &full);
    EXPECT_TRUE(SaveFrameToPNG(frame.get(), m_path.c_str()));
    setrlimit(RLIMIT_FSIZE, &before);
    std::signal(SIGXFSZ, handler);
    EXPECT_EQ(ReadWholeFile(m_path), (Bytes{'o', 'l', 'd'}));
    EXPECT_EQ(m_folder.CountFiles(), 1u);
}

// ---- JPEG

TEST_F(SaveJpeg, WritesAPictureThatLooksTheSame) {
    for (const SHARE_FRAME_FORMAT format : IMAGE_FORMATS) {
        const auto frame = RampFrame(40, 25, format, 200);
        ASSERT_TRUE(SaveFrameToJPEG(frame.get(), 1, m_path.c_str()));
        const DecodedImage decoded = DecodeJpeg(ReadWholeFile(m_path));
        ASSERT_EQ(decoded.width, 40);
        ASSERT_EQ(decoded.height, 25);
        for (int y = 0; y < 25; ++y) {
            for (int x = 0; x < 40; ++x)
                ASSERT_LE(Distance(decoded.At(x, y), Ramp(x, y)), 8) << format << " " << x << "," << y;
        }
    }
}

TEST_F(SaveJpeg, WritesRawPixelsLikeTheFrameOfThem) {
    for (const SHARE_FRAME_FORMAT format : IMAGE_FORMATS) {
        const auto frame = RampFrame(40, 25, format, 200);
        Bytes lines = Lines(40, 25, 200, format);
        ASSERT_TRUE(SaveFrameToJPEG(frame.get(), 0.7F, m_path.c_str()));
        const Bytes expected = ReadWholeFile(m_path);
        ASSERT_TRUE(SaveRawDataToJPEG(lines.data(), 40, 25, 200, format, m_path.c_str(), 0.7F));
        EXPECT_EQ(ReadWholeFile(m_path), expected);
    }
}

TEST_F(SaveJpeg, ObeysTheQuality) {
    const auto frame = RampFrame(40, 25, SHARE_FRAME_FORMAT_RGBA);
    SaveFrameToJPEG(frame.get(), 1, m_path.c_str());
    const std::size_t best = ReadWholeFile(m_path).size();
    SaveFrameToJPEG(frame.get(), 0.1F, m_path.c_str());
    EXPECT_LT(ReadWholeFile(m_path).size(), best);
}

TEST_F(SaveJpeg, RefusesWhatIsNoImage) {
    Bytes lines(64);
    EXPECT_FALSE(SaveRawDataToJPEG(nullptr, 2, 2, 8, SHARE_FRAME_FORMAT_RGBA, m_path.c_str(), 1));
    EXPECT_FALSE(SaveRawDataToJPEG(lines.data(), 2, 2, 8, SHARE_FRAME_FORMAT_BGRA, m_path.c_str(), 1));
    EXPECT_FALSE(SaveRawDataToJPEG(lines.data(), 2, 2, 7, SHARE_FRAME_FORMAT_RGBA, m_path.c_str(), 1));
    EXPECT_FALSE(SaveFrameToJPEG(nullptr, 1, m_path.c_str()));
    EXPECT_FALSE(SaveFrameToJPEG(NewFrame(4, 4, SHARE_FRAME_FORMAT_NONE).get(), 1, m_path.c_str()));
    EXPECT_EQ(m_folder.CountFiles(), 0u);
}

TEST_F(SaveJpeg, ChecksThePathOfAFrameBeforehandAndThatOfRawPixelsNever) {
    const auto frame = RampFrame(4, 4, SHARE_FRAME_FORMAT_RGBA);
    Bytes lines(64);
    EXPECT_FALSE(SaveFrameToJPEG(frame.get(), 1, nullptr));
    EXPECT_TRUE(SaveRawDataToJPEG(lines.data(), 2, 2, 8, SHARE_FRAME_FORMAT_RGBA, nullptr, 1));
    EXPECT_TRUE(SaveFrameToJPEG(frame.get(), 1, (m_folder / "absent/picture").c_str()));
    EXPECT_EQ(m_folder.CountFiles(), 0u);
}

// ---- The documents folder

TEST_F(DocumentDir, IsCopiedWhereThereIsRoom) {
    std::array<char, 64> buffer{};
    buffer.fill('#');
    ASSERT_TRUE(GetDocumentDir(buffer.data(), 63));
    EXPECT_EQ(buffer.data(), m_expected);
    // The copy has its own zero, and the one behind the copy follows it.
    EXPECT_EQ(buffer[m_expected.size() + 1], '\0');
    EXPECT_EQ(buffer[m_expected.size() + 2], '#');
}

TEST_F(DocumentDir, IsCutToTheLengthWithTheZeroBehindIt) {
    std::array<char, 64> buffer{};
    for (const int length : {0, 1, 7, static_cast<int>(m_expected.size())}) {
        buffer.fill('#');
        const auto cut = static_cast<std::size_t>(length);
        ASSERT_TRUE(GetDocumentDir(buffer.data(), length));
        EXPECT_EQ(std::string(buffer.data(), cut), m_expected.substr(0, cut));
        EXPECT_EQ(buffer[cut], '\0');
        EXPECT_EQ(buffer[cut + 1], '#');
    }
}

TEST_F(DocumentDir, IsRefusedWithoutABuffer) {
    char buffer = '#';
    EXPECT_FALSE(GetDocumentDir(nullptr, 10));
    EXPECT_FALSE(GetDocumentDir(&buffer, -1));
    EXPECT_EQ(buffer, '#');
}
