// SPDX-License-Identifier: Apache-2.0
// Lines and rectangles of a frame.
#include "tests/src/share_frame_tools.h"

#include <gtest/gtest.h>

#include <climits>
#include <cstddef>
#include <optional>

namespace {

// A 4 by 4 picture of 64 bytes without spare memory, filled with Pattern(64).
Held<> SmallPicture() {
    auto frame = NewFrame(4, 4, SHARE_FRAME_FORMAT_RGBA);
    EXPECT_EQ(frame->WriteFrameData(Pattern(64).data(), 64), 64);
    return frame;
}

int Write(CShareFrame& frame, TVLRect rect, const Bytes& rows, int len) {
    return frame.WriteFrameAreaData(rect, rows.data(), len);
}

int Write(CShareFrame& frame, TVLRect rect, const Bytes& rows) {
    return Write(frame, rect, rows, Length(rows));
}

int Read(CShareFrame& frame, TVLRect rect, Bytes& rows) {
    return frame.ReadFrameAreaData(rect, rows.data(), Length(rows));
}

TEST(ShareFrameArea, WritesDenseRowsIntoARectangle) {
    const auto frame = SmallPicture();
    Bytes expected = Pattern(64);
    const Bytes rows = Pattern(16, 2);
    EXPECT_EQ(Write(*frame, {1, 1, 3, 3}, rows), 16);
    for (std::size_t i = 0; i < 8; ++i) {
        expected[16 + 4 + i] = rows[i];
        expected[32 + 4 + i] = rows[8 + i];
    }
    EXPECT_EQ(FirstBytes(*frame, 64), expected);
}

TEST(ShareFrameArea, ReadsARectangleIntoDenseRows) {
    const auto frame = SmallPicture();
    const Bytes pixels = Pattern(64);
    Bytes rows(20, 0xEE);
    EXPECT_EQ(Read(*frame, {1, 1, 3, 3}, rows), 16);
    EXPECT_EQ(Part(rows, 0, 8), Part(pixels, 20, 8));
    EXPECT_EQ(Part(rows, 8, 8), Part(pixels, 36, 8));
    EXPECT_EQ(Part(rows, 16, 4), Bytes(4, 0xEE));
}

TEST(ShareFrameArea, MovesTheWholePicture) {
    const auto frame = SmallPicture();
    Bytes rows(64);
    EXPECT_EQ(Read(*frame, {0, 0, 4, 4}, rows), 64);
    EXPECT_EQ(rows, Pattern(64));
    EXPECT_EQ(Write(*frame, {0, 0, 4, 4}, Pattern(64, 5)), 64);
    EXPECT_EQ(FirstBytes(*frame, 64), Pattern(64, 5));
}

TEST(ShareFrameArea, RefusesARectangleThatSticksOutAndMovesNothing) {
    const TVLRect rects[] = {{0, 0, 5, 4},       {0, 0, 4, 5},       {-1, 0, 4, 4},      {0, -1, 4, 4},
                             {4, 0, 5, 4},       {0, 4, 4, 5},       {0, 0, INT_MAX, 1}, {0, 0, 1, INT_MAX},
                             {INT_MIN, 0, 1, 1}, {0, INT_MIN, 1, 1}, {1, 1, 5, 2},       {1, 1, 2, 5}};
    for (const TVLRect& rect : rects) {
        SCOPED_TRACE(testing::Message()
                     << rect.left << ' ' << rect.top << ' ' << rect.right << ' ' << rect.bottom);
        const auto frame = SmallPicture();
        Bytes rows(256, 0xEE);
        EXPECT_EQ(Read(*frame, rect, rows), 0);
        EXPECT_EQ(rows, Bytes(256, 0xEE));
        EXPECT_EQ(Write(*frame, rect, rows), 0);
        EXPECT_EQ(FirstBytes(*frame, 64), Pattern(64));
    }
}

TEST(ShareFrameArea, RefusesARectangleWithoutPixels) {
    for (const TVLRect rect :
         {TVLRect{1, 1, 1, 2}, TVLRect{1, 1, 2, 1}, TVLRect{2, 1, 1, 2}, TVLRect{1, 2, 2, 1}}) {
        const auto frame = SmallPicture();
        Bytes rows(64, 0xEE);
        EXPECT_EQ(Read(*frame, rect, rows), 0);
        EXPECT_EQ(Write(*frame, rect, rows), 0);
        EXPECT_EQ(rows, Bytes(64, 0xEE));
        EXPECT_EQ(FirstBytes(*frame, 64), Pattern(64));
    }
}

TEST(ShareFrameArea, RefusesNullAndALengthBelowOneRow) {
    const auto frame = SmallPicture();
    TVLRect rect{0, 0, 2, 2};
    const Bytes rows = Pattern(64, 2);
    EXPECT_EQ(frame->WriteFrameAreaData(rect, nullptr, 64), 0);
    EXPECT_EQ(frame->ReadFrameAreaData(rect, nullptr, 64), 0);
    for (const int len : {7, 0, -1, INT_MIN}) {
        SCOPED_TRACE(len);
        EXPECT_EQ(Write(*frame, rect, rows, len), 0);
        EXPECT_EQ(FirstBytes(*frame, 64), Pattern(64));
    }
}

TEST(ShareFrameArea, StopsPartWayWhenTheLengthIsLessThanTheArea) {
    const auto frame = SmallPicture();
    const Bytes rows = Pattern(64, 2);
    // Two rows are 32 bytes; that this is more than 31 shows when the second has moved.
    EXPECT_EQ(Write(*frame, {0, 0, 4, 4}, rows, 31), 0);
    EXPECT_EQ(FirstBytes(*frame, 32), Part(rows, 0, 32));
    EXPECT_EQ(Part(FirstBytes(*frame, 64), 32, 32), Part(Pattern(64), 32, 32));
}

TEST(ShareFrameArea, ReadsPartWayWhenTheLengthIsLessThanTheArea) {
    const auto frame = SmallPicture();
    Bytes rows(64, 0xEE);
    TVLRect all{0, 0, 4, 4};
    EXPECT_EQ(frame->ReadFrameAreaData(all, rows.data(), 16), 0);
    EXPECT_EQ(Part(rows, 0, 32), Part(Pattern(64), 0, 32));
    EXPECT_EQ(Part(rows, 32, 32), Bytes(32, 0xEE));
}

TEST(ShareFrameArea, MovesTheLastRowOffTheLeftEdgeAndGivesZero) {
    const auto frame = SmallPicture();
    const Bytes pixels = Pattern(64);
    Bytes rows(16, 0xEE);
    EXPECT_EQ(Read(*frame, {1, 3, 4, 4}, rows), 0);
    EXPECT_EQ(Part(rows, 0, 12), Part(pixels, 52, 12));
    EXPECT_EQ(Part(rows, 12, 4), Bytes(4, 0xEE));

    const Bytes fresh = Pattern(12, 9);
    EXPECT_EQ(Write(*frame, {1, 3, 4, 4}, fresh), 0);
    EXPECT_EQ(Part(FirstBytes(*frame, 64), 52, 12), fresh);
}

TEST(ShareFrameArea, GivesWhatItMovedOfAWholeLastLine) {
    const auto frame = SmallPicture();
    Bytes rows(16);
    EXPECT_EQ(Read(*frame, {0, 3, 4, 4}, rows), 16);
    EXPECT_EQ(rows, Part(Pattern(64), 48, 16));
    EXPECT_EQ(Write(*frame, {0, 3, 3, 4}, rows), 12);
}

TEST(ShareFrameArea, GivesWhatItMovedOffTheLeftEdgeAboveTheLastLine) {
    const auto frame = SmallPicture();
    Bytes rows(24);
    EXPECT_EQ(Read(*frame, {1, 1, 4, 3}, rows), 24);
}

TEST(ShareFrameArea, GivesWhatItMovedOfTheLastLineWhenThereIsSpareMemory) {
    const auto frame = NewFrame(4, 5, SHARE_FRAME_FORMAT_RGBA);
    frame->SetFrameSize(4, 4);
    Bytes rows(12);
    EXPECT_EQ(Read(*frame, {1, 3, 4, 4}, rows), 12);
}

TEST(ShareFrameArea, TakesTheBytesPerPixelFromTheLine) {
    struct Case {
        SHARE_FRAME_FORMAT format;
        int line;
        int moved;
    };
    for (const Case& at : {Case{SHARE_FRAME_FORMAT_RGB, 39, 6}, Case{SHARE_FRAME_FORMAT_RGB, 40, 8},
                           Case{SHARE_FRAME_FORMAT_RGBA, 30, 6}, Case{SHARE_FRAME_FORMAT_RGBA, 49, 8},
                           Case{SHARE_FRAME_FORMAT_RGBA, 50, 10}, Case{SHARE_FRAME_FORMAT_RGBA, 100, 20}}) {
        SCOPED_TRACE(at.line);
        const auto frame = NewFrame(10, 10, at.format);
        ASSERT_EQ(frame->SetFrameLineBytes(at.line), 0);
        const Bytes row = Pattern(20);
        EXPECT_EQ(Write(*frame, {3, 1, 5, 2}, row), at.moved);
        const auto count = static_cast<std::size_t>(at.moved);
        const std::size_t start = static_cast<std::size_t>(at.line) + 3 * count / 2;
        EXPECT_EQ(Part(FirstBytes(*frame, start + count), start, count), Part(row, 0, count));
    }
}

TEST(ShareFrameArea, MovesNothingWithoutAFormat) {
    const auto frame = SmallPicture();
    frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_NONE);
    Bytes rows(64, 0xEE);
    EXPECT_EQ(Read(*frame, {0, 0, 4, 4}, rows), 0);
    EXPECT_EQ(Write(*frame, {0, 0, 4, 4}, rows), 0);
    EXPECT_EQ(rows, Bytes(64, 0xEE));
    EXPECT_EQ(FirstBytes(*frame, 64), Pattern(64));
}

TEST(ShareFrameArea, StaysInTheMemoryThatAResetFoundTooSmall) {
    const auto frame = NewFrame();
    frame->SetFrameSize(10, 10);
    frame->SetFrameLineBytes(30);
    frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    ASSERT_EQ(CapacityOf(*frame), 300);
    frame->Reset();
    const Bytes row = Pattern(40);
    EXPECT_EQ(Write(*frame, {0, 6, 10, 7}, row), 40);
    EXPECT_EQ(Write(*frame, {0, 7, 10, 8}, row), 0);
    EXPECT_EQ(Part(FirstBytes(*frame, 300), 280, 20), Bytes(20, 0));
}

TEST(ShareFrameArea, MovesRowsWithinItself) {
    const auto frame = SmallPicture();
    TVLRect upper{0, 0, 4, 1};
    EXPECT_EQ(frame->WriteFrameAreaData(upper, frame->GetFrameData() + 8, 16), 16);
    EXPECT_EQ(FirstBytes(*frame, 16), Part(Pattern(64), 8, 16));
}

// Lines

TEST(ShareFrameLine, WritesAndReadsOneLine) {
    const auto frame = SmallPicture();
    const Bytes line = Pattern(16, 3);
    EXPECT_EQ(frame->WriteFrameLineData(2, line.data(), 16), 16);
    EXPECT_EQ(Part(FirstBytes(*frame, 64), 32, 16), line);
    Bytes bytes(20, 0xEE);
    EXPECT_EQ(frame->ReadFrameLineData(2, bytes.data(), 20), 16);
    EXPECT_EQ(Part(bytes, 0, 16), line);
    EXPECT_EQ(Part(bytes, 16, 4), Bytes(4, 0xEE));
}

TEST(ShareFrameLine, MovesOnlyThePixelsOfALongerLine) {
    const auto frame = NewFrame(10, 4, SHARE_FRAME_FORMAT_RGB);
    frame->SetFrameLineBytes(39);
    const Bytes line = Pattern(39);
    EXPECT_EQ(frame->WriteFrameLineData(1, line.data(), 39), 30);
    EXPECT_EQ(Part(FirstBytes(*frame, 156), 39, 30), Part(line, 0, 30));
    EXPECT_EQ(Part(FirstBytes(*frame, 156), 69, 9), Bytes(9, 0));
}

TEST(ShareFrameLine, RefusesALineOutsideThePicture) {
    const auto frame = SmallPicture();
    Bytes bytes(16, 0xEE);
    for (const int line : {-1, 4, INT_MAX, INT_MIN}) {
        SCOPED_TRACE(line);
        EXPECT_EQ(frame->WriteFrameLineData(line, bytes.data(), 16), 0);
        EXPECT_EQ(frame->ReadFrameLineData(line, bytes.data(), 16), 0);
    }
    EXPECT_EQ(bytes, Bytes(16, 0xEE));
    EXPECT_EQ(FirstBytes(*frame, 64), Pattern(64));
}

TEST(ShareFrameLine, RefusesABlockShorterThanTheLine) {
    const auto frame = SmallPicture();
    Bytes bytes(16, 0xEE);
    EXPECT_EQ(frame->WriteFrameLineData(0, bytes.data(), 15), 0);
    EXPECT_EQ(frame->ReadFrameLineData(0, bytes.data(), 15), 0);
    EXPECT_EQ(frame->WriteFrameLineData(0, nullptr, 16), 0);
    EXPECT_EQ(frame->ReadFrameLineData(0, nullptr, 16), 0);
    EXPECT_EQ(bytes, Bytes(16, 0xEE));
    EXPECT_EQ(FirstBytes(*frame, 64), Pattern(64));
}

// What may be overridden

class CWatchedFrame : public CShareFrame {
public:
    int WriteFrameAreaData(TVLRect& rect, const unsigned char* data, int len) override {
        m_written = rect;
        return CShareFrame::WriteFrameAreaData(rect, data, len);
    }
    int ReadFrameAreaData(TVLRect& rect, unsigned char* data, int len) override {
        m_read = rect;
        return CShareFrame::ReadFrameAreaData(rect, data, len);
    }

    std::optional<TVLRect> m_written;
    std::optional<TVLRect> m_read;
};

TEST(ShareFrameLine, GoesThroughTheAreaOperations) {
    const auto frame = NewFrame<CWatchedFrame>();
    frame->SetFrameSize(4, 4);
    frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    Bytes line(16);
    EXPECT_EQ(frame->WriteFrameLineData(1, line.data(), 16), 16);
    EXPECT_EQ(frame->m_written, (TVLRect{0, 1, 4, 2}));
    EXPECT_FALSE(frame->m_read);
    EXPECT_EQ(frame->ReadFrameLineData(2, line.data(), 16), 16);
    EXPECT_EQ(frame->m_read, (TVLRect{0, 2, 4, 3}));
}

TEST(ShareFrameLine, AsksTheAreaOperationOfAnEmptyFrameOnlyToRead) {
    const auto frame = NewFrame<CWatchedFrame>();
    Bytes line(16);
    EXPECT_EQ(frame->WriteFrameLineData(1, line.data(), 16), 0);
    EXPECT_FALSE(frame->m_written);
    EXPECT_EQ(frame->ReadFrameLineData(1, line.data(), 16), 0);
    EXPECT_EQ(frame->m_read, (TVLRect{0, 1, 0, 2}));
}

class CFrameOfLines : public CShareFrame {
public:
    int GetFrameLineBytes() override { return m_lineBytes; }

    int m_lineBytes = 0;
};

TEST(ShareFrameArea, FollowsAnOverriddenLineLength) {
    const auto frame = NewFrame<CFrameOfLines>();
    frame->SetFrameSize(4, 4);
    frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    frame->m_lineBytes = 8;
    const Bytes rows = Pattern(64);
    EXPECT_EQ(Write(*frame, {1, 2, 3, 4}, rows), 8);
    EXPECT_EQ(Part(FirstBytes(*frame, 64), 18, 4), Part(rows, 0, 4));
    EXPECT_EQ(Part(FirstBytes(*frame, 64), 26, 4), Part(rows, 4, 4));
    EXPECT_EQ(frame->GetFrameDataLen(), 64);
    EXPECT_EQ(frame->GetFrameLineData(1), frame->GetFrameData() + 16);
}

TEST(ShareFrameArea, StaysInItsMemoryWhateverAnOverriddenLineLengthSays) {
    const auto frame = NewFrame<CFrameOfLines>();
    frame->SetFrameSize(4, 4);
    frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    const Bytes rows = Pattern(128);
    for (const int lineBytes : {-16, -1, 0, 3, 65, INT_MAX, INT_MIN}) {
        SCOPED_TRACE(lineBytes);
        frame->m_lineBytes = lineBytes;
        EXPECT_EQ(Write(*frame, {0, 1, 4, 4}, rows), 0);
        EXPECT_EQ(FirstBytes(*frame, 64), Bytes(64, 0));
    }
}

} // namespace
