// SPDX-License-Identifier: Apache-2.0
#include "tests/tool/capture_frames.h"
#include "tools/capture_png_writer.h"
#include "tools/capture_raw_writer.h"
#include "tools/capture_y4m_writer.h"

#include <gtest/gtest.h>

#include <csignal>

namespace {

using Colours = std::array<unsigned char, 4>;
constexpr Colours WHITE{255, 255, 255, 255};
constexpr Colours BLACK{0, 0, 0, 255};
constexpr Colours GREY{128, 128, 128, 255};
constexpr TVLSize SMALL{4, 2};

constexpr int WHITE_LUMA = 235;
constexpr int BLACK_LUMA = 16;
constexpr int GREY_LUMA = 126;

std::string Words(const WriteResult& result) {
    return result ? std::to_string(result->code) + ": " + result->text : "";
}

/// A stream's header, and the planes of each of its frames.
struct Y4mStream {
    std::string header;
    std::vector<std::string> frames;
    bool isWhole = false;
};

Y4mStream ReadStream(const std::string& file, std::size_t frameBytes) {
    const std::string text = ReadText(file);
    Y4mStream stream;
    std::size_t at = text.find('\n') + 1;
    stream.header = text.substr(0, at);
    for (; at + 6 + frameBytes <= text.size() && text.compare(at, 6, "FRAME\n") == 0; at += 6 + frameBytes)
        stream.frames.push_back(text.substr(at + 6, frameBytes));
    stream.isWhole = at == text.size();
    return stream;
}

/// The first luma sample of each frame.
std::vector<int> LumaOf(const Y4mStream& stream) {
    std::vector<int> luma;
    for (const std::string& frame : stream.frames)
        luma.push_back(static_cast<unsigned char>(frame.front()));
    return luma;
}

class CaptureWriters : public testing::Test {
protected:
    CaptureWriters() { std::signal(SIGPIPE, SIG_IGN); }

    StopFlag stop;
    TemporaryFolder folder;
};

/// Frames of 4x2 at ten a second: 12 bytes each.
class Y4mWriters : public CaptureWriters {
protected:
    static constexpr std::size_t FRAME_BYTES = 4 * 2 + 2 * (2 * 1);

    std::vector<int> LumaWritten() { return LumaOf(ReadStream(folder / "s.y4m", FRAME_BYTES)); }
    WriteResult Write(Y4mWriter& writer, Colours colour, unsigned timestamp, TVLSize size = SMALL) {
        return writer.Write(*PlainFrame(size, colour, timestamp));
    }
};

} // namespace

TEST_F(CaptureWriters, WritePngFilesWithNumbersAndTheFramesPixels) {
    PngFolderWriter writer(folder / "new/deep");
    ASSERT_EQ(Words(writer.Open()), "");
    ASSERT_EQ(Words(writer.Write(*PlainFrame({3, 5}, {10, 20, 30, 255}, 1))), "");
    ASSERT_EQ(Words(writer.Write(*PlainFrame({7, 2}, {90, 80, 70, 255}, 2))), "");
    ASSERT_EQ(Words(writer.Finish(3)), "");
    EXPECT_EQ(writer.FrameCount(), 2);
    const std::string first = folder / "new/deep/frame-000001.png";
    const std::string second = folder / "new/deep/frame-000002.png";
    EXPECT_EQ(writer.BytesWritten(), ReadText(first).size() + ReadText(second).size());
    const DecodedImage image = DecodePng(ReadWholeFile(second));
    ASSERT_EQ(image.width, 7);
    ASSERT_EQ(image.height, 2);
    EXPECT_EQ(image.pixels[0], 90);
    EXPECT_EQ(image.pixels[1], 80);
    EXPECT_EQ(image.pixels[2], 70);
}

TEST_F(CaptureWriters, TellWhyAPngFileIsNotThere) {
    PngFolderWriter writer(folder / "pictures");
    ASSERT_EQ(Words(writer.Open()), "");
    std::filesystem::create_directory(folder / "pictures/frame-000001.png");
    const std::string name = folder / "pictures/frame-000001.png";
    EXPECT_EQ(Words(writer.Write(*PlainFrame(SMALL, WHITE, 1))),
              "5: cannot write " + name + ": it is no plain file");
    std::filesystem::remove_all(folder / "pictures");
    EXPECT_EQ(Words(writer.Write(*PlainFrame(SMALL, WHITE, 1))),
              "5: cannot write " + name + ": No such file or directory");
    EXPECT_EQ(writer.FrameCount(), 0);
}

TEST_F(CaptureWriters, WriteRawPixelsAsBgraWithoutGapsWhateverTheFramesForm) {
    std::vector<std::string> notes;
    RawWriter writer(folder / "raw", stop, [&](const std::string& note) { notes.push_back(note); });
    ASSERT_EQ(Words(writer.Open()), "");
    ASSERT_EQ(Words(writer.Write(*PlainFrame({2, 1}, {1, 2, 3, 4}, 1))), "");
    const auto argb = NewFrame();
    argb->SetFrameDataFormat(SHARE_FRAME_FORMAT_ARGB);
    argb->SetFrameSize(1, 2);
    argb->SetFrameLineBytes(6);
    const Bytes lines{9, 8, 7, 6, 0, 0, 5, 4, 3, 2, 0, 0};
    argb->WriteFrameData(lines.data(), Length(lines));
    ASSERT_EQ(Words(writer.Write(*argb)), "");
    ASSERT_EQ(Words(writer.Write(*argb)), "");
    ASSERT_EQ(Words(writer.Finish(2)), "");
    const std::string twice("\6\7\10\11\2\3\4\5");
    EXPECT_EQ(ReadText(folder / "raw"), std::string("\3\2\1\4\3\2\1\4") + twice + twice);
    EXPECT_EQ(writer.FrameCount(), 3);
    EXPECT_EQ(writer.BytesWritten(), 24u);
    EXPECT_EQ(notes, (std::vector<std::string>{"raw frames: 2x1 BGRA, 8 bytes a line, 8 bytes a frame",
                                               "raw frames: 1x2 BGRA, 4 bytes a line, 8 bytes a frame"}));
}

TEST_F(CaptureWriters, RefuseAFrameThatIsNoPicture) {
    RawWriter raw(folder / "raw", stop, [](const std::string&) {});
    Y4mWriter y4m(folder / "y4m", {}, stop);
    PngFolderWriter png(folder / "png");
    for (FrameWriter* const writer : std::initializer_list<FrameWriter*>{&raw, &y4m, &png}) {
        ASSERT_EQ(Words(writer->Open()), "");
        Bytes tooLittle(4 * 2 * 4 - 1);
        const auto frame = NewFrame();
        frame->SetExternalBuf(tooLittle.data(), Length(tooLittle));
        frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
        frame->SetFrameSize(SMALL);
        if (writer != &png) { // whose image keeps to the memory by itself
            EXPECT_EQ(Words(writer->Write(*frame)), "1: a frame has a form that cannot be written");
        }
        EXPECT_NE(Words(writer->Write(*NewFrame(4, 2, SHARE_FRAME_FORMAT_NONE))), "");
        EXPECT_EQ(writer->FrameCount(), 0);
    }
}

TEST_F(Y4mWriters, BeginWithWhatAReaderNeeds) {
    Y4mWriter writer(folder / "s.y4m", {25, 0}, stop);
    ASSERT_EQ(Words(writer.Open()), "");
    ASSERT_EQ(Words(Write(writer, WHITE, 7, {5, 3})), "");
    ASSERT_EQ(Words(writer.Finish(7)), "");
    const Y4mStream stream = ReadStream(folder / "s.y4m", 5 * 3 + 2 * (3 * 2));
    EXPECT_EQ(stream.header, "YUV4MPEG2 W5 H3 F25:1 Ip A1:1 C420jpeg XYSCSS=420JPEG XCOLORRANGE=LIMITED\n");
    ASSERT_EQ(stream.frames.size(), 1u);
    EXPECT_TRUE(stream.isWhole);
    EXPECT_EQ(stream.frames[0], std::string(15, '\xEB') + std::string(12, '\x80'));
}

TEST_F(Y4mWriters, RepeatAPictureForAsLongAsItWasToBeSeen) {
    Y4mWriter writer(folder / "s.y4m", {10, 0}, stop);
    ASSERT_EQ(Words(writer.Open()), "");
    Write(writer, WHITE, 1000);
    Write(writer, BLACK, 1100);
    Write(writer, GREY, 1500);
    writer.Finish(1800);
    const int w = WHITE_LUMA, b = BLACK_LUMA, g = GREY_LUMA;
    EXPECT_EQ(LumaWritten(), (std::vector<int>{w, b, b, b, b, g, g, g}));
}

TEST_F(Y4mWriters, KeepTheRateWhenTimestampsWaver) {
    Y4mWriter writer(folder / "s.y4m", {10, 0}, stop);
    ASSERT_EQ(Words(writer.Open()), "");
    for (const unsigned timestamp : {1000U, 1149U, 1151U, 1320U, 1400U})
        Write(writer, WHITE, timestamp);
    EXPECT_EQ(writer.FrameCount(), 5);
}

TEST_F(Y4mWriters, LeaveOutAPictureBeforeItsTurnUnlessItStays) {
    Y4mWriter writer(folder / "s.y4m", {10, 0}, stop);
    ASSERT_EQ(Words(writer.Open()), "");
    Write(writer, WHITE, 1000);
    Write(writer, GREY, 1020);
    Write(writer, BLACK, 1040);
    writer.Finish(1300);
    EXPECT_EQ(LumaWritten(), (std::vector<int>{WHITE_LUMA, BLACK_LUMA, BLACK_LUMA}));
}

TEST_F(Y4mWriters, CountTimeOnWhereTimestampsBeginAnewAndNotBackwards) {
    Y4mWriter writer(folder / "s.y4m", {10, 0}, stop);
    ASSERT_EQ(Words(writer.Open()), "");
    Write(writer, WHITE, 0xFFFFFFFFU - 49);
    Write(writer, BLACK, 50);
    Write(writer, GREY, 40); // the clock of another thread, read a little earlier
    Write(writer, GREY, 250);
    EXPECT_EQ(LumaWritten(), (std::vector<int>{WHITE_LUMA, BLACK_LUMA, GREY_LUMA, GREY_LUMA}));
}

TEST_F(Y4mWriters, WriteNoMoreFramesThanTheyMay) {
    Y4mWriter writer(folder / "s.y4m", {10, 5}, stop);
    ASSERT_EQ(Words(writer.Open()), "");
    Write(writer, WHITE, 1000);
    Write(writer, BLACK, 9000);
    writer.Finish(20000);
    EXPECT_EQ(writer.FrameCount(), 5);
    EXPECT_EQ(LumaWritten(), std::vector<int>(5, WHITE_LUMA));
}

TEST_F(Y4mWriters, ScalePicturesOfAnotherSizeIntoTheFirstOneOnBlack) {
    constexpr TVLSize size{20, 10};
    Y4mWriter writer(folder / "s.y4m", {10, 0}, stop);
    ASSERT_EQ(Words(writer.Open()), "");
    Write(writer, GREY, 1000, size);
    Write(writer, WHITE, 1100, {40, 40}); // becomes 10x10 in the middle
    Write(writer, WHITE, 1200, {5, 1});   // becomes 20x4 in the middle
    Write(writer, GREY, 1300, size);
    writer.Finish(1300);
    const Y4mStream stream = ReadStream(folder / "s.y4m", 20 * 10 + 2 * (10 * 5));
    ASSERT_EQ(stream.frames.size(), 4u);
    EXPECT_TRUE(stream.isWhole);
    const auto luma = [&](std::size_t frame, std::size_t x, std::size_t y) {
        return static_cast<int>(static_cast<unsigned char>(stream.frames[frame][y * 20 + x]));
    };
    for (const std::size_t x : {0U, 4U, 15U, 19U})
        EXPECT_EQ(luma(1, x, 5), BLACK_LUMA) << x;
    for (const std::size_t x : {5U, 14U})
        EXPECT_EQ(luma(1, x, 0), WHITE_LUMA) << x;
    for (const std::size_t y : {0U, 2U, 7U, 9U})
        EXPECT_EQ(luma(2, 10, y), BLACK_LUMA) << y;
    for (const std::size_t y : {3U, 6U})
        EXPECT_EQ(luma(2, 0, y), WHITE_LUMA) << y;
    EXPECT_EQ(luma(3, 0, 0), GREY_LUMA);
}

TEST_F(Y4mWriters, MakeAStreamOfNothingWithoutAFrame) {
    Y4mWriter writer(folder / "s.y4m", {}, stop);
    ASSERT_EQ(Words(writer.Open()), "");
    EXPECT_EQ(Words(writer.Finish(1000)), "");
    EXPECT_EQ(ReadText(folder / "s.y4m"), "");
}

TEST_F(CaptureWriters, TellOfADiskThatIsFull) {
    if (access("/dev/full", W_OK) != 0)
        GTEST_SKIP() << "there is no /dev/full";
    Y4mWriter writer("/dev/full", {}, stop);
    ASSERT_EQ(Words(writer.Open()), "");
    EXPECT_EQ(Words(writer.Write(*PlainFrame(SMALL, WHITE, 1))),
              "5: cannot write /dev/full: No space left on device");
    EXPECT_EQ(writer.FrameCount(), 0);
}

TEST_F(CaptureWriters, TellWhenTheReaderOfAPipeHasGone) {
    CapturePipe pipe(folder / "pipe");
    ASSERT_TRUE(pipe.IsThere());
    RawWriter writer(pipe.Path(), stop, [](const std::string&) {});
    ASSERT_EQ(Words(writer.Open()), "");
    EXPECT_GE(writer.PipeDescriptor(), 0);
    ASSERT_EQ(Words(writer.Write(*PlainFrame(SMALL, WHITE, 1))), "");
    pipe.CloseReader();
    EXPECT_EQ(Words(writer.Write(*PlainFrame(SMALL, WHITE, 2))),
              "4: the reader of " + pipe.Path() + " has closed the pipe");
    EXPECT_EQ(writer.FrameCount(), 1);
}

TEST_F(CaptureWriters, GiveUpAReaderThatTakesNothingOnceTheEndIsAskedFor) {
    CapturePipe pipe(folder / "pipe");
    ASSERT_TRUE(pipe.IsThere());
    RawWriter writer(pipe.Path(), stop, [](const std::string&) {});
    ASSERT_EQ(Words(writer.Open()), "");
    stop.Raise();
    ASSERT_EQ(Words(writer.Write(*PlainFrame(SMALL, WHITE, 1))), "") << "there is room, so it is taken";
    EXPECT_EQ(Words(writer.Write(*PlainFrame({1000, 1000}, WHITE, 2))),
              "5: the reader of " + pipe.Path() + " takes nothing any more");
}

TEST_F(CaptureWriters, TellWhatCannotBeOpened) {
    CaptureOutput missing(stop);
    EXPECT_EQ(Words(missing.Open(folder / "none/file")),
              "5: cannot write " + (folder / "none/file") + ": No such file or directory");
    CaptureOutput directory(stop);
    EXPECT_EQ(Words(directory.Open(folder / "")), "5: cannot write " + (folder / "") + ": Is a directory");
}
