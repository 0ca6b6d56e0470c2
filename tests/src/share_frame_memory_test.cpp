// SPDX-License-Identifier: Apache-2.0
// Memory that a client attaches, geometry that wraps, and the order of the interface's operations.
#include "tests/src/share_frame_tools.h"

#include <gtest/gtest.h>

#include <array>
#include <climits>
#include <cstddef>
#include <cstring>

namespace {

// Attached memory

TEST(ShareFrameExternalBuffer, ComesBeforeTheFramesOwnMemory) {
    const auto frame = NewFrame(10, 10, SHARE_FRAME_FORMAT_RGBA);
    Bytes memory(400, 0xEE);
    EXPECT_EQ(frame->SetExternalBuf(memory.data(), 400), 0);
    EXPECT_EQ(frame->GetFrameData(), memory.data());
    EXPECT_EQ(frame->GetFrameLineData(2), memory.data() + 80);
    const Bytes pixels = Pattern(400);
    EXPECT_EQ(frame->WriteFrameData(pixels.data(), 400), 400);
    EXPECT_EQ(memory, pixels);
}

TEST(ShareFrameExternalBuffer, IsDetachedByNullWhateverTheLength) {
    for (const int len : {-1, 0, 1, 1000}) {
        SCOPED_TRACE(len);
        const auto frame = NewFrame();
        Bytes memory(400);
        ASSERT_EQ(frame->SetExternalBuf(memory.data(), 400), 0);
        EXPECT_EQ(frame->SetExternalBuf(nullptr, len), 0);
        EXPECT_EQ(frame->GetFrameData(), nullptr);
    }
}

TEST(ShareFrameExternalBuffer, LeavesItsLengthBehindWhenDetached) {
    const auto frame = NewFrame(10, 10, SHARE_FRAME_FORMAT_RGBA);
    Bytes memory(1000);
    ASSERT_EQ(frame->SetExternalBuf(memory.data(), 1000), 0);
    EXPECT_EQ(frame->SetExternalBuf(nullptr, 0), 0);
    EXPECT_EQ(frame->GetFrameData(), nullptr);
    EXPECT_EQ(frame->GetFrameLineData(0), nullptr);

    Bytes bytes(40);
    EXPECT_EQ(frame->ReadFrameData(bytes.data(), 40), 0);
    EXPECT_EQ(frame->WriteFrameData(bytes.data(), 40), 0);
    EXPECT_EQ(frame->ReadFrameLineData(0, bytes.data(), 40), 0);
    EXPECT_EQ(frame->WriteFrameLineData(0, bytes.data(), 40), 0);

    frame->SetFrameSize(10, 25);
    EXPECT_EQ(frame->GetFrameData(), nullptr) << "1000 bytes still count as there";
    frame->SetFrameSize(100, 100);
    EXPECT_NE(frame->GetFrameData(), nullptr);
    EXPECT_EQ(CapacityOf(*frame), 40000);
    EXPECT_EQ(FirstBytes(*frame, 40000), Bytes(40000, 0));
}

TEST(ShareFrameExternalBuffer, IsReplacedByOwnMemoryAtOnceWhenThePictureNeedsMore) {
    const auto frame = NewFrame(10, 10, SHARE_FRAME_FORMAT_RGBA);
    Bytes memory(399);
    ASSERT_EQ(frame->SetExternalBuf(memory.data(), 399), 0);
    EXPECT_EQ(frame->SetExternalBuf(nullptr, 0), 0);
    ASSERT_NE(frame->GetFrameData(), nullptr);
    EXPECT_EQ(CapacityOf(*frame), 400);
}

TEST(ShareFrameExternalBuffer, IsRefusedBelowOneByte) {
    const auto frame = NewFrame(10, 10, SHARE_FRAME_FORMAT_RGBA);
    unsigned char* own = frame->GetFrameData();
    Bytes memory(400);
    for (const int len : {0, -1, INT_MIN}) {
        EXPECT_EQ(frame->SetExternalBuf(memory.data(), len), -1);
        EXPECT_EQ(frame->SetExternalBuf(nullptr, len), -1);
        EXPECT_EQ(frame->GetFrameData(), own);
        EXPECT_EQ(CapacityOf(*frame), 400);
    }
    ASSERT_EQ(frame->SetExternalBuf(memory.data(), 400), 0);
    EXPECT_EQ(frame->SetExternalBuf(own, 0), -1);
    EXPECT_EQ(frame->GetFrameData(), memory.data());
}

TEST(ShareFrameExternalBuffer, IsNeverTheFramesOwnMemory) {
    const auto frame = NewFrame(10, 10, SHARE_FRAME_FORMAT_RGBA);
    unsigned char* own = frame->GetFrameData();
    EXPECT_EQ(frame->SetExternalBuf(own, 10), -1);
    EXPECT_EQ(frame->GetFrameData(), own);
    EXPECT_EQ(CapacityOf(*frame), 400);
}

TEST(ShareFrameExternalBuffer, NullOnAFrameWithoutMemoryIsRefused) {
    const auto frame = NewFrame();
    EXPECT_EQ(frame->SetExternalBuf(nullptr, 0), -1);
    EXPECT_EQ(frame->SetExternalBuf(nullptr, 100), -1);
    frame->SetFrameSize(10, 2);
    frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    EXPECT_NE(frame->GetFrameData(), nullptr) << "the refused 100 bytes count as there";
}

TEST(ShareFrameExternalBuffer, NullWithALengthTakesTheFramesOwnMemoryAway) {
    const auto frame = NewFrame(10, 10, SHARE_FRAME_FORMAT_RGBA);
    EXPECT_EQ(frame->SetExternalBuf(nullptr, 500), 0);
    EXPECT_EQ(frame->GetFrameData(), nullptr);
    frame->SetFrameSize(25, 5);
    EXPECT_EQ(frame->GetFrameData(), nullptr) << "500 bytes count as there";
    frame->SetFrameSize(21, 6);
    ASSERT_NE(frame->GetFrameData(), nullptr);
    EXPECT_EQ(CapacityOf(*frame), 504);
}

TEST(ShareFrameExternalBuffer, IsReplacedByAnother) {
    const auto frame = NewFrame(10, 10, SHARE_FRAME_FORMAT_RGBA);
    Bytes first(400, 1);
    Bytes second(500, 2);
    ASSERT_EQ(frame->SetExternalBuf(first.data(), 400), 0);
    EXPECT_EQ(frame->SetExternalBuf(second.data(), 500), 0);
    EXPECT_EQ(frame->GetFrameData(), second.data());
    Bytes bytes(600, 0xEE);
    EXPECT_EQ(frame->ReadFrameData(bytes.data(), 600), 600);
    EXPECT_EQ(Part(bytes, 0, 500), second);
    EXPECT_EQ(Part(bytes, 500, 100), Bytes(100, 0xEE));
    EXPECT_EQ(first, Bytes(400, 1));
}

TEST(ShareFrameExternalBuffer, MayBeAttachedAgainWithAnotherLength) {
    const auto frame = NewFrame(10, 10, SHARE_FRAME_FORMAT_RGBA);
    Bytes memory(400);
    ASSERT_EQ(frame->SetExternalBuf(memory.data(), 400), 0);
    EXPECT_EQ(frame->SetExternalBuf(memory.data(), 100), 0);
    Bytes bytes(400, 0xEE);
    EXPECT_EQ(frame->ReadFrameData(bytes.data(), 400), 400);
    EXPECT_EQ(Part(bytes, 100, 300), Bytes(300, 0xEE));
}

TEST(ShareFrameExternalBuffer, KeepsTheGeometryThatItCannotHold) {
    const auto frame = NewFrame();
    Bytes memory(100);
    ASSERT_EQ(frame->SetExternalBuf(memory.data(), 100), 0);
    EXPECT_EQ(frame->SetFrameSize(100, 100), 0);
    EXPECT_EQ(frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA), SHARE_FRAME_FORMAT_RGBA);
    EXPECT_EQ(frame->SetFrameLineBytes(400), 0);
    EXPECT_EQ(frame->GetFrameDataLen(), 40000);
    EXPECT_EQ(frame->GetFrameData(), memory.data());
}

TEST(ShareFrameExternalBuffer, IsTrustedByTheBlockWriterToHoldThePicture) {
    const auto frame = NewFrame();
    Bytes memory(40000, 0xEE);
    ASSERT_EQ(frame->SetExternalBuf(memory.data(), 100), 0);
    frame->SetFrameSize(100, 100);
    frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    const Bytes pixels = Pattern(40001);
    EXPECT_EQ(frame->WriteFrameData(pixels.data(), 40001), 0);
    EXPECT_EQ(memory, Bytes(40000, 0xEE));
    EXPECT_EQ(frame->WriteFrameData(pixels.data(), 40000), 40000);
    EXPECT_EQ(memory, Part(pixels, 0, 40000));
}

TEST(ShareFrameExternalBuffer, IsNotLeftByAnAreaThatItCannotHold) {
    const auto frame = NewFrame();
    Bytes memory(400, 0xEE);
    ASSERT_EQ(frame->SetExternalBuf(memory.data(), 100), 0);
    frame->SetFrameSize(10, 10);
    frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    const Bytes pixels = Pattern(400);
    EXPECT_EQ(frame->WriteFrameLineData(1, pixels.data(), 40), 40);
    EXPECT_EQ(frame->WriteFrameLineData(2, pixels.data(), 40), 0);
    TVLRect rows{0, 0, 10, 10};
    EXPECT_EQ(frame->WriteFrameAreaData(rows, pixels.data(), 400), 0);
    EXPECT_EQ(Part(memory, 0, 80), Part(pixels, 0, 80)) << "the rows that fit stay";
    EXPECT_EQ(Part(memory, 80, 320), Bytes(320, 0xEE));
}

TEST(ShareFrameExternalBuffer, IsNeverFreed) {
    std::array<unsigned char, 400> memory{};
    memory.fill(7);
    {
        const auto frame = NewFrame(10, 10, SHARE_FRAME_FORMAT_RGBA);
        ASSERT_EQ(frame->SetExternalBuf(memory.data(), 400), 0);
    }
    EXPECT_EQ(memory[399], 7);
}

// Lengths beyond 32 bits

TEST(ShareFrameWrap, AllocatesNothingForANegativeProduct) {
    const auto frame = NewFrame(1024, 0x100001, SHARE_FRAME_FORMAT_RGB);
    EXPECT_EQ(frame->GetFrameLineBytes(), 3072);
    EXPECT_LT(frame->GetFrameDataLen(), 0);
    EXPECT_EQ(frame->GetFrameData(), nullptr);
}

TEST(ShareFrameWrap, NeverLeavesTheMemoryThatASmallProductAllocated) {
    const auto frame = NewFrame(1024, 0x100001, SHARE_FRAME_FORMAT_RGBA);
    ASSERT_EQ(frame->GetFrameDataLen(), 4096);
    ASSERT_EQ(CapacityOf(*frame), 4096);
    Bytes pixels = Pattern(12288);

    EXPECT_EQ(frame->WriteFrameData(pixels.data(), 4097), 0);
    EXPECT_EQ(frame->WriteFrameLineData(1, pixels.data(), 4096), 0);
    EXPECT_EQ(frame->WriteFrameLineData(0x100000, pixels.data(), 4096), 0) << "its start wraps to 0";
    TVLRect far{0, 0x80000, 1024, 0x80003};
    EXPECT_EQ(frame->WriteFrameAreaData(far, pixels.data(), Length(pixels)), 0) << "its start wraps below 0";
    EXPECT_EQ(frame->ReadFrameAreaData(far, pixels.data(), Length(pixels)), 0);
    EXPECT_EQ(FirstBytes(*frame, 4096), Bytes(4096, 0));

    EXPECT_EQ(frame->GetFrameLineData(2), nullptr);
    EXPECT_EQ(frame->GetFrameLineData(0x100000), nullptr);
    EXPECT_EQ(frame->WriteFrameLineData(0, pixels.data(), 4096), 4096);
    EXPECT_EQ(frame->WriteFrameData(pixels.data(), 4096), 4096);
}

TEST(ShareFrameWrap, KeepsTheRowsThatFitAnAreaItCannotHold) {
    const auto frame = NewFrame(1024, 0x100001, SHARE_FRAME_FORMAT_RGBA);
    const Bytes pixels = Pattern(16384);
    TVLRect rows{0, 0, 1024, 4};
    EXPECT_EQ(frame->WriteFrameAreaData(rows, pixels.data(), Length(pixels)), 0);
    EXPECT_EQ(FirstBytes(*frame, 4096), Part(pixels, 0, 4096));
}

TEST(ShareFrameWrap, MovesNothingAlongALineOfNegativeLength) {
    const auto frame = NewFrame(4, 4, SHARE_FRAME_FORMAT_RGBA);
    frame->SetFrameSize(0x20000000, 1);
    ASSERT_EQ(frame->GetFrameLineBytes(), INT_MIN);
    ASSERT_EQ(frame->GetFrameDataLen(), INT_MIN);
    Bytes bytes = Pattern(64);
    TVLRect rect{0, 0, 1, 1};
    EXPECT_EQ(frame->WriteFrameData(bytes.data(), 1), 0);
    EXPECT_EQ(frame->WriteFrameAreaData(rect, bytes.data(), 64), 0);
    EXPECT_EQ(frame->WriteFrameLineData(0, bytes.data(), 64), 0);
    EXPECT_EQ(frame->ReadFrameAreaData(rect, bytes.data(), 64), 0);
    EXPECT_EQ(frame->GetFrameLineData(0), nullptr);
    EXPECT_EQ(FirstBytes(*frame, 64), Bytes(64, 0));
    EXPECT_EQ(frame->ReadFrameData(bytes.data(), 64), 64);
    EXPECT_EQ(bytes, Bytes(64, 0));
}

TEST(ShareFrameWrap, WrapsTheLowerBoundOfALineToo) {
    const auto frame = NewFrame();
    frame->SetFrameSize(0x40000000, 1);
    EXPECT_EQ(frame->SetFrameLineBytes(1), 0);
}

TEST(ShareFrameWrap, IsQuickWithAHugePictureOfNoBytes) {
    const auto frame = NewFrame(4, 4, SHARE_FRAME_FORMAT_RGBA);
    frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_NONE);
    frame->SetFrameSize(INT_MAX, INT_MAX);
    Bytes bytes(4);
    TVLRect all{0, 0, INT_MAX, INT_MAX};
    EXPECT_EQ(frame->ReadFrameAreaData(all, bytes.data(), 4), 0);
    EXPECT_EQ(frame->WriteFrameAreaData(all, bytes.data(), 4), 0);
}

// The interface

// How far the entry of a virtual operation is behind the start of its table.
template <class Operation>
int SlotOf(Operation operation) {
    std::ptrdiff_t parts[2];
    static_assert(sizeof(parts) == sizeof(operation));
    std::memcpy(parts, &operation, sizeof(parts));
    return static_cast<int>((parts[0] & ~std::ptrdiff_t{1}) / static_cast<std::ptrdiff_t>(sizeof(void*)));
}

TEST(ShareFrameInterface, KeepsItsOperationsInTheOrderThatClientsWereBuiltWith) {
    using GetNumbers = int (IShareFrame::*)(int&, int&);
    using GetPair = int (IShareFrame::*)(TVLSize&);
    using SetNumbers = int (IShareFrame::*)(int, int);
    using SetPair = int (IShareFrame::*)(TVLSize);
    const std::array<int, 29> slots = {
        SlotOf(&IShareFrame::AddRef),
        SlotOf(&IShareFrame::Release),
        SlotOf(&IShareFrame::QueryInterface),
        SlotOf(&IShareFrame::GetReference),
        SlotOf(&IShareFrame::SetExternalBuf),
        SlotOf(&IShareFrame::SetTimestamp),
        SlotOf(&IShareFrame::GetTimestamp),
        SlotOf(&IShareFrame::GetFrameData),
        SlotOf(&IShareFrame::GetFrameLineData),
        SlotOf(&IShareFrame::GetFrameDataLen),
        SlotOf(&IShareFrame::GetFrameLineBytes),
        SlotOf(&IShareFrame::SetFrameLineBytes),
        SlotOf(&IShareFrame::SetFrameDataFormat),
        SlotOf(&IShareFrame::GetFrameDataFormat),
        SlotOf(static_cast<GetNumbers>(&IShareFrame::GetFrameSize)),
        SlotOf(static_cast<GetPair>(&IShareFrame::GetFrameSize)),
        SlotOf(static_cast<SetNumbers>(&IShareFrame::SetFrameSize)),
        SlotOf(static_cast<SetPair>(&IShareFrame::SetFrameSize)),
        SlotOf(&IShareFrame::WriteFrameData),
        SlotOf(&IShareFrame::WriteFrameLineData),
        SlotOf(&IShareFrame::WriteFrameAreaData),
        SlotOf(&IShareFrame::ReadFrameData),
        SlotOf(&IShareFrame::ReadFrameLineData),
        SlotOf(&IShareFrame::ReadFrameAreaData),
        SlotOf(&IShareFrame::CopyIShareFrame),
        SlotOf(&IShareFrame::SwapOrCopy),
        SlotOf(&IShareFrame::Reset),
        SlotOf(&IShareFrame::SetMetaInfo),
        SlotOf(&IShareFrame::GetMetaInfo),
    };
    constexpr int DESTRUCTORS = 2;
    for (std::size_t i = 0; i < slots.size(); ++i)
        EXPECT_EQ(slots[i], static_cast<int>(i) + DESTRUCTORS);
}

TEST(ShareFrameInterface, IsTheFirstBaseOfTheFrame) {
    const auto frame = NewFrame();
    EXPECT_EQ(static_cast<void*>(static_cast<IShareFrame*>(frame.get())), static_cast<void*>(frame.get()));
    IShareFrame* face = frame.get();
    EXPECT_EQ(dynamic_cast<CShareFrame*>(face), frame.get());
}

} // namespace

TEST(ShareFrame, ComparesNoMoreThanItsMemoryHolds) {
    auto* const a = new CShareFrame;
    auto* const b = new CShareFrame;
    for (CShareFrame* const frame : {a, b}) {
        frame->AddRef();
        frame->SetFrameSize(10, 10);
        frame->SetFrameLineBytes(30);
        frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
        frame->Reset(); // lines of 40 bytes now, in memory for lines of 30
    }
    ASSERT_EQ(a->GetFrameDataLen(), 400);
    EXPECT_TRUE(a->HasSameData(*b));
    b->GetFrameData()[299] = 1;
    EXPECT_FALSE(a->HasSameData(*b));
    b->SetFrameSize(10, 9);
    EXPECT_FALSE(a->HasSameData(*b));
    a->Release();
    b->Release();
}

TEST(ShareFrame, IsTheSameAsAnotherWithoutPixels) {
    auto* const a = new CShareFrame;
    auto* const b = new CShareFrame;
    a->AddRef();
    b->AddRef();
    EXPECT_TRUE(a->HasSameData(*b));
    b->SetFrameSize(1, 1);
    b->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    EXPECT_FALSE(a->HasSameData(*b));
    a->Release();
    b->Release();
}
