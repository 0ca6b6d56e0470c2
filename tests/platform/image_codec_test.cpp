// SPDX-License-Identifier: Apache-2.0
#include "platform/image_codec.h"
#include "tests/platform/image_files.h"

#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <csignal>
#include <cstddef>
#include <filesystem>
#include <iterator>
#include <limits>
#include <memory>
#include <string>
#include <thread>

/// Encoded images, read back by the libraries' own decoders, and what becomes of the files.

namespace {

using namespace platform;
namespace fs = std::filesystem;

Bytes Encode(const CGImageRef& image, NSBitmapImageFileType type, const NSImageProperties& properties = {}) {
    return NSBitmapImageRep(image).representationUsingType(type, properties);
}

Bytes EncodePng(const CGImageRef& image) {
    return Encode(image, NSBitmapImageFileTypePNG);
}

Bytes EncodeJpeg(const CGImageRef& image, float quality) {
    return Encode(image, NSBitmapImageFileTypeJPEG, {quality});
}

/// Soft transitions and hard edges; the same at every call.
Colour Scenery(int x, int y) {
    if (x > 20 && x < 30 && y > 10)
        return {250, 20, 20, 255};
    return {x * 4 % 256, y * 5 % 256, (x + y) * 2 % 256, 255};
}

CGImageRef MakeScenery(CGPixelLayout layout = CGPixelLayout::BGRX) {
    return MakeImage(60, 40, layout, Scenery, 3);
}

CGImageRef Blank(int width, int height) {
    const auto bytes =
        std::make_shared<Bytes>(static_cast<std::size_t>(width) * static_cast<std::size_t>(height) * 4);
    return CGImageCreate(width, height, static_cast<std::size_t>(width) * 4, CGPixelLayout::BGRX,
                         bytes->data(), bytes);
}

std::size_t CountDescriptors() {
    return static_cast<std::size_t>(
        std::distance(fs::directory_iterator("/proc/self/fd"), fs::directory_iterator()));
}

/// While it lives, files can't grow beyond a length, as on a full disk.
class ShortFilesScope {
public:
    explicit ShortFilesScope(rlim_t length) : m_handler(std::signal(SIGXFSZ, SIG_IGN)) {
        getrlimit(RLIMIT_FSIZE, &m_before);
        const rlimit limit{length, m_before.rlim_max};
        setrlimit(RLIMIT_FSIZE, &limit);
    }
    ~ShortFilesScope() {
        setrlimit(RLIMIT_FSIZE, &m_before);
        std::signal(SIGXFSZ, m_handler);
    }
    ShortFilesScope(const ShortFilesScope&) = delete;
    ShortFilesScope& operator=(const ShortFilesScope&) = delete;

private:
    void (*m_handler)(int);
    rlimit m_before{};
};

/// While it lives, root is nobody: what may not be written is refused to root, too.
class PlainUserScope {
public:
    PlainUserScope() : m_user(geteuid()) { m_isPlain = m_user != 0 || seteuid(65534) == 0; }
    ~PlainUserScope() {
        if (m_user == 0 && seteuid(0) != 0)
            std::abort();
    }
    PlainUserScope(const PlainUserScope&) = delete;
    PlainUserScope& operator=(const PlainUserScope&) = delete;

    bool IsPlain() const { return m_isPlain; }

private:
    uid_t m_user;
    bool m_isPlain = false;
};

const Bytes OLD{'o', 'l', 'd'};
const Bytes NEW{'n', 'e', 'w', '!'};

class WriteToFile : public testing::Test {
protected:
    void TearDown() override { EXPECT_EQ(CountDescriptors(), m_descriptors) << "a file stayed open"; }

    TemporaryFolder m_folder;
    const std::string m_path = m_folder / "picture.png";

private:
    const std::size_t m_descriptors = CountDescriptors();
};

} // namespace

// ---- PNG

TEST(PngFile, HoldsEveryPixelOfEveryLayout) {
    for (const CGPixelLayout layout : ALL_LAYOUTS) {
        const CGImageRef image = MakeImage(60, 40, layout, Scenery, 3);
        const DecodedImage decoded = DecodePng(EncodePng(image));
        ASSERT_EQ(decoded.width, 60);
        ASSERT_EQ(decoded.height, 40);
        EXPECT_EQ(decoded.hasAlpha, CGHasAlpha(layout));
        for (int y = 0; y < 40; ++y) {
            for (int x = 0; x < 60; ++x) {
                Colour expected = PixelOf(*image, x, y);
                expected.alpha = 255;
                ASSERT_EQ(decoded.At(x, y), expected)
                    << "layout " << static_cast<int>(layout) << " " << x << "," << y;
            }
        }
    }
}

TEST(PngFile, HoldsColoursThatAreNotPremultiplied) {
    // Every alpha with every colour that it allows.
    const CGImageRef image = MakeImage(256, 256, CGPixelLayout::BGRA, [](int x, int y) {
        return Colour{std::min(x, y), y / 2, 0, y};
    });
    const DecodedImage decoded = DecodePng(EncodePng(image));
    ASSERT_EQ(decoded.width, 256);
    for (int alpha = 0; alpha < 256; ++alpha) {
        for (int x = 0; x < 256; ++x) {
            const auto straight = [alpha](int colour) {
                return alpha == 0 ? colour : static_cast<int>(colour * 255.0 / alpha + 0.5);
            };
            ASSERT_EQ(decoded.At(x, alpha),
                      (Colour{straight(std::min(x, alpha)), straight(alpha / 2), 0, alpha}));
        }
    }
}

TEST(PngFile, StandsColoursAboveTheirAlpha) {
    const CGImageRef image = MakeImage(1, 1, CGPixelLayout::RGBA, [](int, int) {
        return Colour{255, 9, 0, 10};
    });
    EXPECT_EQ(DecodePng(EncodePng(image)).At(0, 0), (Colour{255, 230, 0, 10}));
}

TEST(PngFile, HoldsWhatCannotBeCompressed) {
    unsigned state = 1;
    const CGImageRef image = MakeImage(301, 203, CGPixelLayout::RGBX, [&](int, int) {
        state = state * 1664525u + 1013904223u;
        return Colour{static_cast<int>(state >> 24), static_cast<int>(state >> 16 & 255),
                      static_cast<int>(state >> 8 & 255), 0};
    });
    const DecodedImage decoded = DecodePng(EncodePng(image));
    ASSERT_EQ(decoded.width, 301);
    for (int y = 0; y < 203; ++y) {
        for (int x = 0; x < 301; ++x)
            ASSERT_EQ(Distance(decoded.At(x, y), PixelOf(*image, x, y)), 0);
    }
}

TEST(PngFile, IsNotMadeOfWhatItCannotTake) {
    EXPECT_EQ(EncodePng(nullptr), Bytes{});
    EXPECT_EQ(EncodePng(Blank(1'000'001, 1)), Bytes{});
    EXPECT_NE(EncodePng(Blank(70'000, 1)), Bytes{});
}

// ---- JPEG

TEST(JpegFile, ShowsTheImageOfEveryLayout) {
    for (const CGPixelLayout layout : ALL_LAYOUTS) {
        const DecodedImage decoded = DecodeJpeg(EncodeJpeg(MakeScenery(layout), 1));
        ASSERT_EQ(decoded.width, 60);
        ASSERT_EQ(decoded.height, 40);
        for (int y = 0; y < 40; ++y) {
            for (int x = 0; x < 60; ++x)
                ASSERT_LE(Distance(decoded.At(x, y), Scenery(x, y)), 8) << static_cast<int>(layout);
        }
    }
}

TEST(JpegFile, IsSmallerAndWorseAtALowerQuality) {
    const CGImageRef image = MakeScenery();
    const Bytes best = EncodeJpeg(image, 1);
    const Bytes half = EncodeJpeg(image, 0.5F);
    const Bytes least = EncodeJpeg(image, 0);
    EXPECT_LT(half.size(), best.size());
    EXPECT_LT(least.size(), half.size());
    EXPECT_GT(Distance(DecodeJpeg(least).At(29, 30), Scenery(29, 30)), 8);
}

TEST(JpegFile, HoldsTheQualityWithinItsRange) {
    const CGImageRef image = MakeScenery();
    EXPECT_EQ(EncodeJpeg(image, 7), EncodeJpeg(image, 1));
    EXPECT_EQ(EncodeJpeg(image, std::numeric_limits<float>::infinity()), EncodeJpeg(image, 1));
    EXPECT_EQ(EncodeJpeg(image, -3), EncodeJpeg(image, 0));
    EXPECT_EQ(EncodeJpeg(image, std::numeric_limits<float>::quiet_NaN()), EncodeJpeg(image, 0));
    EXPECT_EQ(Encode(image, NSBitmapImageFileTypeJPEG), EncodeJpeg(image, 1));
}

TEST(JpegFile, LiesOnBlackWhereTheImageIsTransparent) {
    const CGImageRef image = MakeImage(16, 16, CGPixelLayout::ARGB, [](int, int) {
        return Colour{100, 60, 20, 128};
    });
    EXPECT_LE(Distance(DecodeJpeg(EncodeJpeg(image, 1)).At(8, 8), {100, 60, 20}), 3);
}

TEST(JpegFile, IsNotMadeOfWhatItCannotTake) {
    EXPECT_EQ(EncodeJpeg(nullptr, 1), Bytes{});
    EXPECT_EQ(EncodeJpeg(Blank(65'536, 1), 1), Bytes{});
    EXPECT_EQ(EncodeJpeg(Blank(1, 65'536), 1), Bytes{});
    EXPECT_NE(EncodeJpeg(Blank(65'000, 1), 1), Bytes{});
}

TEST(ImageFile, IsNotMadeOfAnUnknownType) {
    EXPECT_EQ(Encode(MakeScenery(), static_cast<NSBitmapImageFileType>(0)), Bytes{});
}

// ---- Files

TEST_F(WriteToFile, MakesAndReplacesAFile) {
    for (const bool atomically : {true, false}) {
        EXPECT_TRUE(writeToFile(OLD, m_path.c_str(), atomically));
        EXPECT_EQ(ReadWholeFile(m_path), OLD);
        EXPECT_TRUE(writeToFile(NEW, m_path.c_str(), atomically));
        EXPECT_EQ(ReadWholeFile(m_path), NEW);
    }
    EXPECT_EQ(m_folder.CountFiles(), 1u);
}

TEST_F(WriteToFile, LeavesTheFileToWhomTheUserAllows) {
    const mode_t before = umask(027);
    writeToFile(NEW, m_path.c_str(), true);
    umask(before);
    EXPECT_EQ(fs::status(m_path).permissions(), static_cast<fs::perms>(0640));
}

TEST_F(WriteToFile, FailsWithoutAPathOrAFolder) {
    EXPECT_FALSE(writeToFile(NEW, nullptr, true));
    EXPECT_FALSE(writeToFile(NEW, "", true));
    EXPECT_FALSE(writeToFile(NEW, (m_folder / "absent/picture.png").c_str(), true));
    EXPECT_FALSE(writeToFile(NEW, (m_folder / "absent/picture.png").c_str(), false));
    EXPECT_EQ(m_folder.CountFiles(), 0u);
}

TEST_F(WriteToFile, TakesTheLongestNameThereCanBe) {
    const std::string path = m_folder / std::string(255, 'n');
    EXPECT_TRUE(writeToFile(NEW, path.c_str(), true));
    EXPECT_EQ(ReadWholeFile(path), NEW);
    EXPECT_FALSE(writeToFile(NEW, (path + "n").c_str(), true));
    EXPECT_EQ(m_folder.CountFiles(), 1u);
}

TEST_F(WriteToFile, FailsInAFolderThatMayNotBeWritten) {
    const TemporaryFolder folder;
    const std::string path = folder / "picture.png";
    writeToFile(OLD, path.c_str(), true);
    fs::permissions(folder.Path(), static_cast<fs::perms>(0555));
    {
        const PlainUserScope plainUser;
        ASSERT_TRUE(plainUser.IsPlain());
        EXPECT_FALSE(writeToFile(NEW, path.c_str(), true));
        EXPECT_FALSE(writeToFile(NEW, (folder / "other.png").c_str(), false));
    }
    fs::permissions(folder.Path(), static_cast<fs::perms>(0755));
    EXPECT_EQ(ReadWholeFile(path), OLD);
    EXPECT_EQ(folder.CountFiles(), 1u);
}

TEST_F(WriteToFile, LeavesTheOldFileWhenTheDiskIsFull) {
    writeToFile(OLD, m_path.c_str(), true);
    const Bytes large(10'000, std::uint8_t{1});
    {
        const ShortFilesScope fullDisk(4096);
        EXPECT_FALSE(writeToFile(large, m_path.c_str(), true));
        EXPECT_EQ(ReadWholeFile(m_path), OLD);
        EXPECT_EQ(m_folder.CountFiles(), 1u) << "a part of the new file was left";
        EXPECT_FALSE(writeToFile(large, m_path.c_str(), false));
    }
    EXPECT_TRUE(writeToFile(large, m_path.c_str(), true));
    EXPECT_EQ(ReadWholeFile(m_path), large);
}

TEST_F(WriteToFile, TellsOfADeviceThatIsFull) {
    EXPECT_FALSE(writeToFile(NEW, "/dev/full", false));
}

TEST_F(WriteToFile, ReplacesALinkAndNotWhatItPointsTo) {
    const std::string other = m_folder / "other";
    WriteWholeFile(other, "old");
    fs::create_symlink(other, m_path);
    EXPECT_TRUE(writeToFile(NEW, m_path.c_str(), true));
    EXPECT_EQ(ReadWholeFile(other), OLD);
    EXPECT_EQ(ReadWholeFile(m_path), NEW);
    EXPECT_FALSE(fs::is_symlink(m_path));
}

TEST_F(WriteToFile, ReplacesNothingThatIsNoFile) {
    ASSERT_EQ(mkfifo(m_path.c_str(), 0600), 0);
    const std::string folder = m_folder / "folder";
    fs::create_directory(folder);
    EXPECT_FALSE(writeToFile(NEW, m_path.c_str(), true));
    EXPECT_FALSE(writeToFile(NEW, folder.c_str(), true));
    EXPECT_TRUE(fs::is_fifo(m_path));
    EXPECT_TRUE(fs::is_directory(folder));
    EXPECT_EQ(m_folder.CountFiles(), 2u);
}

TEST_F(WriteToFile, ShowsTheFileBeforeOrTheFileAfter) {
    const Bytes first(100'000, std::uint8_t{1});
    const Bytes second(50'000, std::uint8_t{2});
    writeToFile(first, m_path.c_str(), true);
    std::atomic<bool> stop{false};
    const auto keepWriting = [&](const Bytes& data) {
        while (!stop)
            EXPECT_TRUE(writeToFile(data, m_path.c_str(), true));
    };
    std::thread one(keepWriting, std::cref(first));
    std::thread two(keepWriting, std::cref(second));
    int seenSecond = 0;
    for (int looks = 0; looks < 100; ++looks) {
        const Bytes seen = ReadWholeFile(m_path);
        EXPECT_TRUE(seen == first || seen == second) << seen.size() << " bytes";
        seenSecond += seen == second;
    }
    stop = true;
    one.join();
    two.join();
    EXPECT_EQ(m_folder.CountFiles(), 1u);
    std::printf("%d of 100 looks saw the second file\n", seenSecond);
}

// ---- Destinations

TEST_F(WriteToFile, WritesTheImageOfADestination) {
    const CGImageDestinationRef destination = CGImageDestinationCreateWithURL(m_path.c_str(), kUTTypePNG, 1);
    ASSERT_NE(destination, nullptr);
    EXPECT_FALSE(CGImageDestinationFinalize(destination.get())) << "it has no image yet";
    CGImageDestinationAddImage(destination.get(), nullptr);
    EXPECT_FALSE(CGImageDestinationFinalize(destination.get()));
    CGImageDestinationAddImage(destination.get(), MakeScenery());
    CGImageDestinationAddImage(destination.get(), Blank(2, 2));
    EXPECT_EQ(m_folder.CountFiles(), 0u);
    EXPECT_TRUE(CGImageDestinationFinalize(destination.get()));
    EXPECT_EQ(DecodePng(ReadWholeFile(m_path)).At(25, 30), Scenery(25, 30));
}

TEST_F(WriteToFile, TellsWhenADestinationCannotBeWritten) {
    const CGImageDestinationRef destination =
        CGImageDestinationCreateWithURL((m_folder / "absent/picture.png").c_str(), kUTTypePNG, 1);
    CGImageDestinationAddImage(destination.get(), MakeScenery());
    EXPECT_FALSE(CGImageDestinationFinalize(destination.get()));
}

TEST_F(WriteToFile, HasDestinationsForOnePngFileOnly) {
    EXPECT_EQ(CGImageDestinationCreateWithURL(nullptr, kUTTypePNG, 1), nullptr);
    EXPECT_EQ(CGImageDestinationCreateWithURL("", kUTTypePNG, 1), nullptr);
    EXPECT_EQ(CGImageDestinationCreateWithURL(m_path.c_str(), nullptr, 1), nullptr);
    EXPECT_EQ(CGImageDestinationCreateWithURL(m_path.c_str(), "image", 1), nullptr);
    EXPECT_EQ(CGImageDestinationCreateWithURL(m_path.c_str(), kUTTypePNG, 2), nullptr);
    CGImageDestinationAddImage(nullptr, MakeScenery());
    EXPECT_FALSE(CGImageDestinationFinalize(nullptr));
}
