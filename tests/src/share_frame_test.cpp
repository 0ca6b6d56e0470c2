// SPDX-License-Identifier: Apache-2.0
// A frame's life, geometry, memory and block transfers.
#include "src/share_frame.h"

#include "tests/src/share_frame_tools.h"

#include <gtest/gtest.h>

#include <array>
#include <climits>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <new>

namespace {

// What the next allocation of an array answers; and what memory holds before anybody has written to it.
bool g_failNextArray = false;
constexpr int HEAP_RUBBISH = 0xCD;

} // namespace

void* operator new[](std::size_t size) {
    void* memory = std::exchange(g_failNextArray, false) ? nullptr : std::malloc(size);
    if (memory == nullptr)
        throw std::bad_alloc();
    return std::memset(memory, HEAP_RUBBISH, size);
}
void operator delete[](void* memory) noexcept {
    std::free(memory);
}
void operator delete[](void* memory, std::size_t) noexcept {
    std::free(memory);
}

namespace {

class CMortalFrame : public CShareFrame {
public:
    explicit CMortalFrame(bool& gone) : m_gone(gone) {}

protected:
    ~CMortalFrame() override { m_gone = true; }

private:
    bool& m_gone;
};

// Life

TEST(ShareFrame, CountsFromZeroAndEndsWithTheLastRelease) {
    bool gone = false;
    IShareFrame* frame = new CMortalFrame(gone);
    EXPECT_EQ(frame->GetReference(), 0u);
    EXPECT_EQ(frame->AddRef(), 1u);
    EXPECT_EQ(frame->AddRef(), 2u);
    EXPECT_EQ(frame->GetReference(), 2u);
    EXPECT_EQ(frame->Release(), 1u);
    EXPECT_FALSE(gone);
    EXPECT_EQ(frame->Release(), 0u);
    EXPECT_TRUE(gone);
}

TEST(ShareFrame, GivesItsCountingPartForTheRootId) {
    const auto frame = NewFrame();
    void* part = nullptr;
    EXPECT_EQ(frame->QueryInterface(QVNIID_IQvnUnknown, &part), 0);
    EXPECT_EQ(part, static_cast<qvn::CQvnUnknownImpl*>(frame.get()));
    EXPECT_NE(part, static_cast<void*>(frame.get()));
    EXPECT_EQ(frame->GetReference(), 2u);
    frame->Release();
}

TEST(ShareFrame, KnowsNoOtherId) {
    const auto frame = NewFrame();
    qvn::_tagUUID other = QVNIID_IQvnUnknown;
    other.bytes[15] ^= 1;
    void* part = frame.get();
    EXPECT_EQ(frame->QueryInterface(other, &part), 0x46004005);
    EXPECT_EQ(part, nullptr);
    EXPECT_EQ(frame->GetReference(), 1u);
}

TEST(ShareFrame, RefusesANullOutPointer) {
    const auto frame = NewFrame();
    EXPECT_EQ(frame->QueryInterface(QVNIID_IQvnUnknown, nullptr), 0x46004006);
    EXPECT_EQ(frame->GetReference(), 1u);
}

TEST(ShareFrame, StartsWithNothing) {
    const auto frame = NewFrame();
    int width = -1;
    int height = -1;
    EXPECT_EQ(frame->GetFrameSize(width, height), 0);
    EXPECT_EQ(width, 0);
    EXPECT_EQ(height, 0);
    EXPECT_EQ(frame->GetFrameDataFormat(), SHARE_FRAME_FORMAT_NONE);
    EXPECT_EQ(frame->GetFrameData(), nullptr);
    EXPECT_EQ(frame->GetFrameDataLen(), 0);
    EXPECT_EQ(frame->GetFrameLineBytes(), 0);
    EXPECT_EQ(frame->GetFrameLineData(0), nullptr);
    EXPECT_EQ(frame->GetTimestamp(), 0u);
    EXPECT_EQ(frame->GetMetaInfo().rectCapture, (TVLRect{0, 0, 0, 0}));
    EXPECT_FALSE(frame->GetMetaInfo().bPointerCaptured);
}

TEST(ShareFrame, MovesNoByteBeforeItHasAPicture) {
    const auto frame = NewFrame();
    Bytes bytes = Pattern(64);
    const Bytes before = bytes;
    TVLRect rect{0, 0, 1, 1};
    EXPECT_EQ(frame->WriteFrameData(bytes.data(), 1), 0);
    EXPECT_EQ(frame->WriteFrameLineData(0, bytes.data(), 1), 0);
    EXPECT_EQ(frame->WriteFrameAreaData(rect, bytes.data(), 1), 0);
    EXPECT_EQ(frame->ReadFrameData(bytes.data(), 1), 0);
    EXPECT_EQ(frame->ReadFrameLineData(0, bytes.data(), 1), 0);
    EXPECT_EQ(frame->ReadFrameAreaData(rect, bytes.data(), 1), 0);
    EXPECT_EQ(bytes, before);
}

// Size and format

TEST(ShareFrame, TakesANegativeSizeForZero) {
    const auto frame = NewFrame();
    int width = -1;
    int height = -1;
    EXPECT_EQ(frame->SetFrameSize(-5, 10), 0);
    frame->GetFrameSize(width, height);
    EXPECT_EQ(width, 0);
    EXPECT_EQ(height, 10);
    EXPECT_EQ(frame->SetFrameSize(10, INT_MIN), 0);
    frame->GetFrameSize(width, height);
    EXPECT_EQ(width, 10);
    EXPECT_EQ(height, 0);
}

TEST(ShareFrame, TakesAndGivesItsSizeAsAPairToo) {
    const auto frame = NewFrame();
    EXPECT_EQ(frame->SetFrameSize(TVLSize{-7, 9}), 0);
    TVLSize size{-1, -1};
    EXPECT_EQ(frame->GetFrameSize(size), 0);
    EXPECT_EQ(size, (TVLSize{0, 9}));
}

TEST(ShareFrame, KnowsTheBytesPerPixelOfEachFormat) {
    const std::array<int, 7> bytesPerPixel = {0, 4, 4, 3, 4, 4, 3};
    for (int value = 0; value < 7; ++value) {
        SCOPED_TRACE(value);
        const auto format = static_cast<SHARE_FRAME_FORMAT>(value);
        const auto frame = NewFrame(10, 20, format);
        EXPECT_EQ(frame->GetFrameDataFormat(), format);
        EXPECT_EQ(frame->GetFrameLineBytes(), 10 * bytesPerPixel[static_cast<std::size_t>(value)]);
        EXPECT_EQ(frame->GetFrameDataLen(), 200 * bytesPerPixel[static_cast<std::size_t>(value)]);
    }
}

TEST(ShareFrame, GivesTheFormatThatItTook) {
    const auto frame = NewFrame();
    EXPECT_EQ(frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_ABGR), SHARE_FRAME_FORMAT_ABGR);
    EXPECT_EQ(frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_NONE), SHARE_FRAME_FORMAT_NONE);
}

TEST(ShareFrame, IgnoresAValueThatIsNoFormat) {
    const auto frame = NewFrame(2, 2, SHARE_FRAME_FORMAT_RGB);
    for (const int value : {7, INT_MAX, -1, INT_MIN}) {
        SCOPED_TRACE(value);
        EXPECT_EQ(frame->SetFrameDataFormat(static_cast<SHARE_FRAME_FORMAT>(value)), SHARE_FRAME_FORMAT_RGB);
        EXPECT_EQ(frame->GetFrameDataFormat(), SHARE_FRAME_FORMAT_RGB);
        EXPECT_EQ(frame->GetFrameDataLen(), 12);
    }
}

// Memory

TEST(ShareFrame, AllocatesNothingWithoutAFormat) {
    const auto frame = NewFrame();
    frame->SetFrameSize(100, 100);
    EXPECT_EQ(frame->GetFrameData(), nullptr);
    EXPECT_EQ(frame->GetFrameDataLen(), 0);
    frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    EXPECT_NE(frame->GetFrameData(), nullptr);
}

TEST(ShareFrame, AllocatesExactlyItsDataLength) {
    const auto frame = NewFrame(100, 100, SHARE_FRAME_FORMAT_RGBA);
    EXPECT_EQ(frame->GetFrameDataLen(), 40000);
    EXPECT_EQ(CapacityOf(*frame), 40000);
}

TEST(ShareFrame, NeverGivesMemoryBack) {
    const auto frame = NewFrame(100, 100, SHARE_FRAME_FORMAT_RGBA);
    const unsigned char* address = frame->GetFrameData();
    frame->SetFrameSize(50, 50);
    EXPECT_EQ(frame->GetFrameDataLen(), 10000);
    EXPECT_EQ(CapacityOf(*frame), 40000);
    EXPECT_EQ(frame->GetFrameData(), address);
}

TEST(ShareFrame, KeepsItsPixelsWhileTheyFit) {
    const auto frame = NewFrame(10, 10, SHARE_FRAME_FORMAT_RGBA);
    const Bytes pixels = Pattern(400);
    ASSERT_EQ(frame->WriteFrameData(pixels.data(), 400), 400);
    frame->SetFrameSize(5, 5);
    frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGB);
    frame->SetFrameSize(20, 5);
    EXPECT_EQ(FirstBytes(*frame, 400), pixels);
}

TEST(ShareFrame, ShowsNoPixelAndNoHeapAfterAGrowth) {
    const auto frame = NewFrame(10, 10, SHARE_FRAME_FORMAT_RGBA);
    EXPECT_EQ(FirstBytes(*frame, 400), Bytes(400, 0));
    ASSERT_EQ(frame->WriteFrameData(Pattern(400).data(), 400), 400);
    frame->SetFrameSize(10, 11);
    EXPECT_EQ(FirstBytes(*frame, 440), Bytes(440, 0));
}

TEST(ShareFrame, HasNoPixelsButItsGeometryAfterAFailedAllocation) {
    const auto frame = NewFrame(10, 10, SHARE_FRAME_FORMAT_RGBA);
    g_failNextArray = true;
    EXPECT_THROW(frame->SetFrameSize(100, 100), std::bad_alloc);
    EXPECT_EQ(frame->GetFrameData(), nullptr);
    EXPECT_EQ(frame->GetFrameDataLen(), 40000);
    Bytes bytes(40);
    EXPECT_EQ(frame->ReadFrameData(bytes.data(), 40), 0);
    EXPECT_EQ(frame->WriteFrameData(bytes.data(), 40), 0);
}

TEST(ShareFrame, AllocatesAgainAfterAFailedAllocation) {
    const auto frame = NewFrame(10, 10, SHARE_FRAME_FORMAT_RGBA);
    g_failNextArray = true;
    EXPECT_THROW(frame->SetFrameSize(100, 100), std::bad_alloc);
    frame->SetFrameSize(10, 10);
    ASSERT_NE(frame->GetFrameData(), nullptr);
    EXPECT_EQ(CapacityOf(*frame), 400);
    EXPECT_EQ(FirstBytes(*frame, 400), Bytes(400, 0));
}

// Line length

TEST(ShareFrame, AcceptsALineOfThreeBytesAPixelWhateverTheFormat) {
    const auto frame = NewFrame(10, 10, SHARE_FRAME_FORMAT_RGBA);
    EXPECT_EQ(frame->SetFrameLineBytes(29), -1);
    EXPECT_EQ(frame->GetFrameLineBytes(), 40);
    EXPECT_EQ(frame->SetFrameLineBytes(30), 0);
    EXPECT_EQ(frame->GetFrameLineBytes(), 30);
    EXPECT_EQ(frame->GetFrameDataLen(), 300);
}

TEST(ShareFrame, RefusesALineBelowOneByte) {
    const auto frame = NewFrame();
    EXPECT_EQ(frame->SetFrameLineBytes(0), -1);
    EXPECT_EQ(frame->SetFrameLineBytes(-1), -1);
    EXPECT_EQ(frame->SetFrameLineBytes(INT_MIN), -1);
    EXPECT_EQ(frame->SetFrameLineBytes(1), 0);
}

TEST(ShareFrame, CountsItsLineAsNothingWithoutAFormat) {
    const auto frame = NewFrame(10, 10, SHARE_FRAME_FORMAT_NONE);
    EXPECT_EQ(frame->SetFrameLineBytes(64), 0);
    EXPECT_EQ(frame->GetFrameLineBytes(), 0);
    EXPECT_EQ(frame->GetFrameDataLen(), 0);
    frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGB);
    EXPECT_EQ(frame->GetFrameLineBytes(), 64);
    EXPECT_EQ(CapacityOf(*frame), 640);
}

TEST(ShareFrame, GrowsForALongerLine) {
    const auto frame = NewFrame(10, 10, SHARE_FRAME_FORMAT_RGBA);
    EXPECT_EQ(frame->SetFrameLineBytes(64), 0);
    EXPECT_EQ(CapacityOf(*frame), 640);
}

TEST(ShareFrame, KeepsAnExplicitLineAcrossSizes) {
    const auto frame = NewFrame(10, 10, SHARE_FRAME_FORMAT_RGBA);
    frame->SetFrameLineBytes(64);
    frame->SetFrameSize(5, 2);
    EXPECT_EQ(frame->GetFrameLineBytes(), 64);
    EXPECT_EQ(frame->GetFrameDataLen(), 128);
    frame->SetFrameSize(100, 2);
    EXPECT_EQ(frame->GetFrameLineBytes(), 64);
}

TEST(ShareFrame, ForgetsOnlyTheLineOnReset) {
    const auto frame = NewFrame(10, 10, SHARE_FRAME_FORMAT_RGBA);
    frame->SetFrameLineBytes(64);
    frame->SetTimestamp(77);
    frame->SetMetaInfo({{1, 2, 3, 4}, true});
    const Bytes pixels = Pattern(640);
    ASSERT_EQ(frame->WriteFrameData(pixels.data(), 640), 640);
    const unsigned char* address = frame->GetFrameData();

    frame->Reset();

    EXPECT_EQ(frame->GetFrameLineBytes(), 40);
    EXPECT_EQ(frame->GetFrameDataLen(), 400);
    TVLSize size{};
    frame->GetFrameSize(size);
    EXPECT_EQ(size, (TVLSize{10, 10}));
    EXPECT_EQ(frame->GetFrameDataFormat(), SHARE_FRAME_FORMAT_RGBA);
    EXPECT_EQ(frame->GetTimestamp(), 77u);
    EXPECT_TRUE(frame->GetMetaInfo().bPointerCaptured);
    EXPECT_EQ(frame->GetFrameData(), address);
    EXPECT_EQ(FirstBytes(*frame, 640), pixels);
}

TEST(ShareFrame, RefusesABlockThatAResetLeftNoRoomFor) {
    const auto frame = NewFrame();
    frame->SetFrameSize(10, 10);
    frame->SetFrameLineBytes(30);
    frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    ASSERT_EQ(CapacityOf(*frame), 300);
    frame->Reset();
    EXPECT_EQ(frame->GetFrameDataLen(), 400);
    const Bytes pixels = Pattern(400);
    EXPECT_EQ(frame->WriteFrameData(pixels.data(), 301), 0);
    EXPECT_EQ(FirstBytes(*frame, 300), Bytes(300, 0));
    EXPECT_EQ(frame->WriteFrameData(pixels.data(), 300), 300);
    frame->SetFrameSize(10, 10);
    EXPECT_EQ(frame->WriteFrameData(pixels.data(), 400), 400);
}

TEST(ShareFrame, GivesTheAddressOfEachLineAndOfTheOneBehind) {
    const auto frame = NewFrame(10, 4, SHARE_FRAME_FORMAT_RGBA);
    unsigned char* data = frame->GetFrameData();
    EXPECT_EQ(frame->GetFrameLineData(0), data);
    EXPECT_EQ(frame->GetFrameLineData(3), data + 120);
    EXPECT_EQ(frame->GetFrameLineData(4), data + 160);
    EXPECT_EQ(frame->GetFrameLineData(5), nullptr);
    EXPECT_EQ(frame->GetFrameLineData(INT_MAX), nullptr);
}

TEST(ShareFrame, GivesAnAddressBeforeThePictureForANegativeLine) {
    const auto frame = NewFrame(10, 4, SHARE_FRAME_FORMAT_RGBA);
    const auto data = reinterpret_cast<std::uintptr_t>(frame->GetFrameData());
    EXPECT_EQ(reinterpret_cast<std::uintptr_t>(frame->GetFrameLineData(-1)), data - 40);
    EXPECT_EQ(reinterpret_cast<std::uintptr_t>(frame->GetFrameLineData(INT_MIN)),
              data - static_cast<std::uintptr_t>(40 * -std::int64_t{INT_MIN}));
}

TEST(ShareFrame, GivesTheStartForAnyLineWithoutAFormat) {
    const auto frame = NewFrame(10, 4, SHARE_FRAME_FORMAT_RGBA);
    frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_NONE);
    for (const int line : {0, 3, 100, -100})
        EXPECT_EQ(frame->GetFrameLineData(line), frame->GetFrameData());
}

// Blocks

TEST(ShareFrame, WritesABlockWithoutRegardToLines) {
    const auto frame = NewFrame(10, 10, SHARE_FRAME_FORMAT_RGB);
    frame->SetFrameLineBytes(64);
    const Bytes pixels = Pattern(500);
    EXPECT_EQ(frame->WriteFrameData(pixels.data(), 500), 500);
    EXPECT_EQ(FirstBytes(*frame, 500), pixels);
    EXPECT_EQ(frame->WriteFrameData(pixels.data(), 0), 0);
}

TEST(ShareFrame, RefusesABlockOneByteTooLong) {
    const auto frame = NewFrame(10, 10, SHARE_FRAME_FORMAT_RGBA);
    frame->SetFrameSize(10, 5);
    const Bytes pixels = Pattern(201);
    EXPECT_EQ(frame->WriteFrameData(pixels.data(), 201), 0);
    EXPECT_EQ(FirstBytes(*frame, 201), Bytes(201, 0));
    EXPECT_EQ(frame->WriteFrameData(pixels.data(), 200), 200);
}

TEST(ShareFrame, RefusesNullAndANegativeLengthToWrite) {
    const auto frame = NewFrame(10, 10, SHARE_FRAME_FORMAT_RGBA);
    const Bytes pixels = Pattern(400);
    EXPECT_EQ(frame->WriteFrameData(nullptr, 4), 0);
    EXPECT_EQ(frame->WriteFrameData(pixels.data(), -1), 0);
    EXPECT_EQ(frame->WriteFrameData(pixels.data(), INT_MIN), 0);
    EXPECT_EQ(FirstBytes(*frame, 400), Bytes(400, 0));
}

TEST(ShareFrame, RefusesToWriteAndReadWithoutWidthOrHeight) {
    for (const TVLSize size : {TVLSize{0, 10}, TVLSize{10, 0}}) {
        const auto frame = NewFrame(10, 10, SHARE_FRAME_FORMAT_RGBA);
        frame->SetFrameLineBytes(40);
        frame->SetFrameSize(size);
        Bytes bytes(4);
        EXPECT_EQ(frame->WriteFrameData(bytes.data(), 4), 0);
        EXPECT_EQ(frame->ReadFrameData(bytes.data(), 4), 0);
    }
}

TEST(ShareFrame, ReadsUpToItsCapacityAndGivesWhatWasAskedFor) {
    const auto frame = NewFrame(10, 10, SHARE_FRAME_FORMAT_RGBA);
    const Bytes pixels = Pattern(400);
    ASSERT_EQ(frame->WriteFrameData(pixels.data(), 400), 400);
    frame->SetFrameSize(2, 2);
    Bytes bytes(600, 0xEE);
    EXPECT_EQ(frame->ReadFrameData(bytes.data(), 600), 600);
    EXPECT_EQ(Part(bytes, 0, 400), pixels);
    EXPECT_EQ(Part(bytes, 400, 200), Bytes(200, 0xEE));
}

TEST(ShareFrame, ReadsTheStartWhenLessIsAskedFor) {
    const auto frame = NewFrame(10, 10, SHARE_FRAME_FORMAT_RGBA);
    const Bytes pixels = Pattern(400);
    ASSERT_EQ(frame->WriteFrameData(pixels.data(), 400), 400);
    Bytes bytes(20, 0xEE);
    EXPECT_EQ(frame->ReadFrameData(bytes.data(), 10), 10);
    EXPECT_EQ(Part(bytes, 0, 10), Part(pixels, 0, 10));
    EXPECT_EQ(Part(bytes, 10, 10), Bytes(10, 0xEE));
    EXPECT_EQ(frame->ReadFrameData(bytes.data(), 0), 0);
}

TEST(ShareFrame, ReadsWithoutAFormatWhatItStillHolds) {
    const auto frame = NewFrame(10, 10, SHARE_FRAME_FORMAT_RGBA);
    const Bytes pixels = Pattern(400);
    ASSERT_EQ(frame->WriteFrameData(pixels.data(), 400), 400);
    frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_NONE);
    Bytes bytes(400);
    EXPECT_EQ(frame->ReadFrameData(bytes.data(), 400), 400);
    EXPECT_EQ(bytes, pixels);
    EXPECT_EQ(frame->WriteFrameData(pixels.data(), 1), 0);
}

TEST(ShareFrame, RefusesNullAndANegativeLengthToRead) {
    const auto frame = NewFrame(10, 10, SHARE_FRAME_FORMAT_RGBA);
    Bytes bytes(4, 0xEE);
    EXPECT_EQ(frame->ReadFrameData(nullptr, 4), 0);
    EXPECT_EQ(frame->ReadFrameData(bytes.data(), -1), 0);
    EXPECT_EQ(bytes, Bytes(4, 0xEE));
}

TEST(ShareFrame, MovesABlockWithinItself) {
    const auto frame = NewFrame(10, 10, SHARE_FRAME_FORMAT_RGBA);
    const Bytes pixels = Pattern(400);
    ASSERT_EQ(frame->WriteFrameData(pixels.data(), 400), 400);
    EXPECT_EQ(frame->WriteFrameData(frame->GetFrameLineData(1), 360), 360);
    EXPECT_EQ(FirstBytes(*frame, 360), Part(pixels, 40, 360));
}

// Time and meta information

TEST(ShareFrame, KeepsItsTimestamp) {
    const auto frame = NewFrame();
    frame->SetTimestamp(0xFFFFFFFFu);
    EXPECT_EQ(frame->GetTimestamp(), 0xFFFFFFFFu);
    frame->SetTimestamp(0);
    EXPECT_EQ(frame->GetTimestamp(), 0u);
}

TEST(ShareFrame, KeepsACopyOfItsMetaInformation) {
    const auto frame = NewFrame();
    IShareFrame::MetaInfo info{{-1, -2, 300, 400}, true};
    frame->SetMetaInfo(info);
    info.rectCapture.left = 99;
    EXPECT_EQ(frame->GetMetaInfo().rectCapture, (TVLRect{-1, -2, 300, 400}));
    EXPECT_TRUE(frame->GetMetaInfo().bPointerCaptured);
}

} // namespace
