// SPDX-License-Identifier: Apache-2.0
// One frame from another: by copy and by exchange.
#include "tests/src/share_frame_tools.h"

#include <gtest/gtest.h>

namespace {

TVLSize SizeOf(IShareFrame& frame) {
    TVLSize size{};
    frame.GetFrameSize(size);
    return size;
}

/// A frame that somebody else wrote: it shows figures and bytes, and refuses to be touched.
class CForeignFrame : public IShareFrame {
public:
    unsigned AddRef() override { return ++m_references; }
    unsigned Release() override {
        const unsigned left = --m_references;
        if (left == 0)
            delete this;
        return left;
    }
    int QueryInterface(const qvn::_tagUUID&, void**) override { return Refuse(); }
    unsigned GetReference() override { return m_references; }

    int SetExternalBuf(unsigned char*, int) override { return Refuse(); }
    void SetTimestamp(unsigned) override { Refuse(); }
    unsigned GetTimestamp() override { return 4711; }
    unsigned char* GetFrameData() override { return m_pixels.empty() ? nullptr : m_pixels.data(); }
    unsigned char* GetFrameLineData(int) override { return nullptr; }
    int GetFrameDataLen() override { return m_dataLen; }
    int GetFrameLineBytes() override { return m_lineBytes; }
    int SetFrameLineBytes(int) override { return Refuse(); }
    SHARE_FRAME_FORMAT SetFrameDataFormat(SHARE_FRAME_FORMAT) override {
        Refuse();
        return m_format;
    }
    SHARE_FRAME_FORMAT GetFrameDataFormat() override { return m_format; }
    int GetFrameSize(int& width, int& height) override {
        width = m_size.cx;
        height = m_size.cy;
        return 0;
    }
    int GetFrameSize(TVLSize& size) override {
        size = m_size;
        return 0;
    }
    int SetFrameSize(int, int) override { return Refuse(); }
    int SetFrameSize(TVLSize) override { return Refuse(); }
    int WriteFrameData(const unsigned char*, int) override { return Refuse(); }
    int WriteFrameLineData(int, const unsigned char*, int) override { return Refuse(); }
    int WriteFrameAreaData(TVLRect&, const unsigned char*, int) override { return Refuse(); }
    int ReadFrameData(unsigned char*, int) override { return Refuse(); }
    int ReadFrameLineData(int, unsigned char*, int) override { return Refuse(); }
    int ReadFrameAreaData(TVLRect&, unsigned char*, int) override { return Refuse(); }
    int CopyIShareFrame(IShareFrame*) override { return Refuse(); }
    int SwapOrCopy(IShareFrame*) override { return Refuse(); }
    void Reset() override { Refuse(); }
    void SetMetaInfo(const MetaInfo&) override { Refuse(); }
    MetaInfo GetMetaInfo() const override { return {{5, 6, 7, 8}, true}; }

    TVLSize m_size{3, 2};
    SHARE_FRAME_FORMAT m_format = SHARE_FRAME_FORMAT_ABGR;
    int m_lineBytes = 14;
    int m_dataLen = 28;
    Bytes m_pixels = Pattern(28);

protected:
    ~CForeignFrame() override = default;

private:
    static int Refuse() {
        ADD_FAILURE() << "a copy or an exchange touches a frame that it only may look at";
        return -1;
    }

    unsigned m_references = 0;
};

// Two pictures that differ in everything.
struct TwoPictures {
    TwoPictures() {
        a->SetFrameLineBytes(48);
        a->WriteFrameData(Pattern(480).data(), 480);
        a->SetTimestamp(11);
        a->SetMetaInfo({{1, 2, 3, 4}, true});
        b->WriteFrameData(Pattern(60, 2).data(), 60);
        b->SetTimestamp(22);
        b->SetMetaInfo({{5, 6, 7, 8}, false});
    }

    Held<> a = NewFrame(10, 10, SHARE_FRAME_FORMAT_ARGB);
    Held<> b = NewFrame(4, 5, SHARE_FRAME_FORMAT_BGR);
};

class CDerivedFrame : public CShareFrame {};

TEST(ShareFrame, TellsFramesOfOursFromOthers) {
    const auto plain = NewFrame<CShareFrame>();
    const auto derived = NewFrame<CDerivedFrame>();
    const auto foreign = NewFrame<CForeignFrame>();
    EXPECT_EQ(CShareFrame::OwnOf(plain.get()), plain.get());
    EXPECT_EQ(CShareFrame::OwnOf(derived.get()), derived.get());
    EXPECT_EQ(CShareFrame::OwnOf(foreign.get()), nullptr);
    EXPECT_EQ(CShareFrame::OwnOf(nullptr), nullptr);
}

// Copy

TEST(ShareFrameCopy, RefusesNullAndChangesNothing) {
    TwoPictures two;
    EXPECT_EQ(two.a->CopyIShareFrame(nullptr), -2);
    EXPECT_EQ(SizeOf(*two.a), (TVLSize{10, 10}));
    EXPECT_EQ(two.a->GetTimestamp(), 11u);
    EXPECT_EQ(two.a->GetFrameLineBytes(), 48);
    EXPECT_EQ(FirstBytes(*two.a, 480), Pattern(480));
}

TEST(ShareFrameCopy, TakesGeometryTimeAndPixels) {
    TwoPictures two;
    EXPECT_EQ(two.b->CopyIShareFrame(two.a.get()), 0);
    EXPECT_EQ(SizeOf(*two.b), (TVLSize{10, 10}));
    EXPECT_EQ(two.b->GetFrameDataFormat(), SHARE_FRAME_FORMAT_ARGB);
    EXPECT_EQ(two.b->GetFrameLineBytes(), 48);
    EXPECT_EQ(two.b->GetTimestamp(), 11u);
    EXPECT_EQ(FirstBytes(*two.b, 480), Pattern(480));
    EXPECT_NE(two.b->GetFrameData(), two.a->GetFrameData());
    EXPECT_EQ(FirstBytes(*two.a, 480), Pattern(480));
}

TEST(ShareFrameCopy, LeavesMetaInformationBehind) {
    TwoPictures two;
    two.b->CopyIShareFrame(two.a.get());
    EXPECT_EQ(two.b->GetMetaInfo().rectCapture, (TVLRect{5, 6, 7, 8}));
    EXPECT_FALSE(two.b->GetMetaInfo().bPointerCaptured);
}

TEST(ShareFrameCopy, MakesADerivedLineExplicit) {
    TwoPictures two;
    two.a->CopyIShareFrame(two.b.get());
    EXPECT_EQ(two.a->GetFrameLineBytes(), 12);
    two.a->SetFrameSize(2, 2);
    EXPECT_EQ(two.a->GetFrameLineBytes(), 12);
}

TEST(ShareFrameCopy, ReusesMemoryThatIsLargeEnough) {
    TwoPictures two;
    const unsigned char* address = two.a->GetFrameData();
    two.a->CopyIShareFrame(two.b.get());
    EXPECT_EQ(two.a->GetFrameData(), address);
    EXPECT_EQ(CapacityOf(*two.a), 480);
    EXPECT_EQ(FirstBytes(*two.a, 60), Pattern(60, 2));
}

TEST(ShareFrameCopy, NeedsNoMoreMemoryThanTheSourceHas) {
    const auto source = NewFrame(10, 10, SHARE_FRAME_FORMAT_RGB);
    ASSERT_EQ(source->SetFrameLineBytes(30), 0);
    source->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    ASSERT_EQ(CapacityOf(*source), 300);
    const auto frame = NewFrame();
    EXPECT_EQ(frame->CopyIShareFrame(source.get()), 0);
    EXPECT_EQ(CapacityOf(*frame), 300) << "the line is set before the format";
}

TEST(ShareFrameCopy, KeepsItsExplicitLineWhenTheSourceHasNoFormat) {
    const auto source = NewFrame(7, 3, SHARE_FRAME_FORMAT_NONE);
    source->SetTimestamp(33);
    TwoPictures two;
    EXPECT_EQ(two.a->CopyIShareFrame(source.get()), 0);
    EXPECT_EQ(SizeOf(*two.a), (TVLSize{7, 3}));
    EXPECT_EQ(two.a->GetTimestamp(), 33u);
    EXPECT_EQ(two.a->GetFrameDataFormat(), SHARE_FRAME_FORMAT_NONE);
    EXPECT_EQ(two.a->GetFrameLineBytes(), 0);
    EXPECT_EQ(FirstBytes(*two.a, 480), Pattern(480));
    two.a->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    EXPECT_EQ(two.a->GetFrameLineBytes(), 48);
}

TEST(ShareFrameCopy, TakesAnyImplementationForASource) {
    const auto source = NewFrame<CForeignFrame>();
    const auto frame = NewFrame();
    EXPECT_EQ(frame->CopyIShareFrame(source.get()), 0);
    EXPECT_EQ(SizeOf(*frame), (TVLSize{3, 2}));
    EXPECT_EQ(frame->GetFrameDataFormat(), SHARE_FRAME_FORMAT_ABGR);
    EXPECT_EQ(frame->GetFrameLineBytes(), 14);
    EXPECT_EQ(frame->GetTimestamp(), 4711u);
    EXPECT_EQ(FirstBytes(*frame, 28), Pattern(28));
    EXPECT_FALSE(frame->GetMetaInfo().bPointerCaptured);
}

TEST(ShareFrameCopy, CopiesTheSmallerOfBothLengths) {
    const auto source = NewFrame<CForeignFrame>();
    const auto frame = NewFrame();
    source->m_dataLen = 20;
    frame->CopyIShareFrame(source.get());
    EXPECT_EQ(FirstBytes(*frame, 20), Pattern(20));
    EXPECT_EQ(Part(FirstBytes(*frame, 28), 20, 8), Bytes(8, 0));

    source->m_pixels = Pattern(64, 3);
    source->m_dataLen = 64;
    frame->CopyIShareFrame(source.get());
    EXPECT_EQ(FirstBytes(*frame, 28), Pattern(28, 3));
}

TEST(ShareFrameCopy, KeepsItsOwnLineWhenTheSourcesIsTooShort) {
    const auto source = NewFrame<CForeignFrame>();
    source->m_lineBytes = 8;
    source->m_dataLen = 16;
    const auto frame = NewFrame();
    EXPECT_EQ(frame->CopyIShareFrame(source.get()), 0);
    EXPECT_EQ(frame->GetFrameLineBytes(), 12);
    EXPECT_EQ(FirstBytes(*frame, 16), Pattern(16));
    EXPECT_EQ(Part(FirstBytes(*frame, 24), 16, 8), Bytes(8, 0));
}

TEST(ShareFrameCopy, SucceedsWithoutAPixelToCopy) {
    const auto source = NewFrame<CForeignFrame>();
    source->m_pixels.clear();
    const auto frame = NewFrame();
    EXPECT_EQ(frame->CopyIShareFrame(source.get()), 0);
    EXPECT_EQ(SizeOf(*frame), (TVLSize{3, 2}));
    EXPECT_EQ(FirstBytes(*frame, 28), Bytes(28, 0));
    source->m_pixels = Pattern(28);
    source->m_dataLen = -1;
    EXPECT_EQ(frame->CopyIShareFrame(source.get()), 0);
    EXPECT_EQ(FirstBytes(*frame, 28), Bytes(28, 0));
}

TEST(ShareFrameCopy, IgnoresWhatIsNoSizeAndNoFormat) {
    const auto source = NewFrame<CForeignFrame>();
    source->m_size = {-3, 2};
    source->m_format = static_cast<SHARE_FRAME_FORMAT>(9);
    const auto frame = NewFrame(1, 1, SHARE_FRAME_FORMAT_RGB);
    EXPECT_EQ(frame->CopyIShareFrame(source.get()), 0);
    EXPECT_EQ(SizeOf(*frame), (TVLSize{0, 2}));
    EXPECT_EQ(frame->GetFrameDataFormat(), SHARE_FRAME_FORMAT_RGB);
}

TEST(ShareFrameCopy, OfItselfKeepsThePicture) {
    TwoPictures two;
    EXPECT_EQ(two.b->CopyIShareFrame(two.b.get()), 0);
    EXPECT_EQ(SizeOf(*two.b), (TVLSize{4, 5}));
    EXPECT_EQ(two.b->GetTimestamp(), 22u);
    EXPECT_EQ(FirstBytes(*two.b, 60), Pattern(60, 2));
}

TEST(ShareFrameCopy, GoesIntoAttachedMemory) {
    TwoPictures two;
    Bytes memory(480, 0xEE);
    two.b->SetExternalBuf(memory.data(), 480);
    EXPECT_EQ(two.b->CopyIShareFrame(two.a.get()), 0);
    EXPECT_EQ(memory, Pattern(480));
}

TEST(ShareFrameCopy, ReadsNoMoreThanAResetSourceHas) {
    const auto source = NewFrame();
    source->SetFrameSize(10, 10);
    source->SetFrameLineBytes(30);
    source->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    ASSERT_EQ(source->WriteFrameData(Pattern(300).data(), 300), 300);
    source->Reset();
    ASSERT_EQ(source->GetFrameDataLen(), 400);

    const auto frame = NewFrame();
    EXPECT_EQ(frame->CopyIShareFrame(source.get()), 0);
    EXPECT_EQ(frame->GetFrameDataLen(), 400);
    EXPECT_EQ(FirstBytes(*frame, 300), Pattern(300));
    EXPECT_EQ(Part(FirstBytes(*frame, 400), 300, 100), Bytes(100, 0));
}

// Exchange

TEST(ShareFrameSwap, ExchangesEverything) {
    TwoPictures two;
    const unsigned char* dataOfA = two.a->GetFrameData();
    const unsigned char* dataOfB = two.b->GetFrameData();

    EXPECT_EQ(two.a->SwapOrCopy(two.b.get()), 0);

    EXPECT_EQ(two.a->GetFrameData(), dataOfB);
    EXPECT_EQ(SizeOf(*two.a), (TVLSize{4, 5}));
    EXPECT_EQ(two.a->GetFrameDataFormat(), SHARE_FRAME_FORMAT_BGR);
    EXPECT_EQ(two.a->GetFrameLineBytes(), 12);
    EXPECT_EQ(two.a->GetTimestamp(), 22u);
    EXPECT_EQ(two.a->GetMetaInfo().rectCapture, (TVLRect{5, 6, 7, 8}));
    EXPECT_FALSE(two.a->GetMetaInfo().bPointerCaptured);
    EXPECT_EQ(CapacityOf(*two.a), 60);
    EXPECT_EQ(FirstBytes(*two.a, 60), Pattern(60, 2));

    EXPECT_EQ(two.b->GetFrameData(), dataOfA);
    EXPECT_EQ(SizeOf(*two.b), (TVLSize{10, 10}));
    EXPECT_EQ(two.b->GetFrameDataFormat(), SHARE_FRAME_FORMAT_ARGB);
    EXPECT_EQ(two.b->GetFrameLineBytes(), 48);
    EXPECT_EQ(two.b->GetTimestamp(), 11u);
    EXPECT_EQ(two.b->GetMetaInfo().rectCapture, (TVLRect{1, 2, 3, 4}));
    EXPECT_TRUE(two.b->GetMetaInfo().bPointerCaptured);
    EXPECT_EQ(CapacityOf(*two.b), 480);
    EXPECT_EQ(FirstBytes(*two.b, 480), Pattern(480));
}

TEST(ShareFrameSwap, LeavesReferencesWhereTheyAre) {
    TwoPictures two;
    two.a->AddRef();
    two.a->SwapOrCopy(two.b.get());
    EXPECT_EQ(two.a->GetReference(), 2u);
    EXPECT_EQ(two.b->GetReference(), 1u);
    two.a->Release();
}

TEST(ShareFrameSwap, MovesWhetherALineWasExplicit) {
    TwoPictures two;
    two.a->SwapOrCopy(two.b.get());
    two.a->SetFrameSize(2, 2);
    two.b->SetFrameSize(2, 2);
    EXPECT_EQ(two.a->GetFrameLineBytes(), 6);
    EXPECT_EQ(two.b->GetFrameLineBytes(), 48);
}

TEST(ShareFrameSwap, MovesAPictureOutOfAnEmptyFrameToo) {
    TwoPictures two;
    const auto empty = NewFrame();
    EXPECT_EQ(empty->SwapOrCopy(two.a.get()), 0);
    EXPECT_EQ(FirstBytes(*empty, 480), Pattern(480));
    EXPECT_EQ(two.a->GetFrameData(), nullptr);
    EXPECT_EQ(two.a->GetFrameDataLen(), 0);
}

TEST(ShareFrameSwap, MovesTheLengthThatADetachedBufferLeft) {
    TwoPictures two;
    Bytes memory(1000);
    two.b->SetExternalBuf(memory.data(), 1000);
    two.b->SetExternalBuf(nullptr, 0);
    two.b->SwapOrCopy(two.a.get());
    two.a->SetFrameSize(4, 80);
    EXPECT_EQ(two.a->GetFrameData(), nullptr);
    EXPECT_EQ(FirstBytes(*two.b, 480), Pattern(480));
}

TEST(ShareFrameSwap, CopiesIntoAttachedMemory) {
    TwoPictures two;
    Bytes memory(480, 0xEE);
    two.b->SetExternalBuf(memory.data(), 480);
    EXPECT_EQ(two.b->SwapOrCopy(two.a.get()), 0);
    EXPECT_EQ(two.b->GetFrameData(), memory.data());
    EXPECT_EQ(memory, Pattern(480));
    EXPECT_EQ(two.b->GetMetaInfo().rectCapture, (TVLRect{5, 6, 7, 8}));
    EXPECT_EQ(two.a->GetTimestamp(), 11u);
    EXPECT_EQ(FirstBytes(*two.a, 480), Pattern(480));
}

TEST(ShareFrameSwap, CopiesFromAttachedMemory) {
    TwoPictures two;
    Bytes memory = Pattern(60, 9);
    two.b->SetExternalBuf(memory.data(), 60);
    EXPECT_EQ(two.a->SwapOrCopy(two.b.get()), 0);
    EXPECT_EQ(FirstBytes(*two.a, 60), memory);
    EXPECT_NE(two.a->GetFrameData(), memory.data());
    EXPECT_EQ(two.a->GetTimestamp(), 22u);
    EXPECT_EQ(two.a->GetMetaInfo().rectCapture, (TVLRect{1, 2, 3, 4}));
    EXPECT_EQ(two.b->GetFrameData(), memory.data());
    EXPECT_EQ(SizeOf(*two.b), (TVLSize{4, 5}));
}

TEST(ShareFrameSwap, RefusesNullAndChangesNothing) {
    TwoPictures two;
    EXPECT_EQ(two.a->SwapOrCopy(nullptr), -2);
    EXPECT_EQ(two.a->GetTimestamp(), 11u);
    EXPECT_EQ(FirstBytes(*two.a, 480), Pattern(480));
}

TEST(ShareFrameSwap, CopiesFromAForeignFrame) {
    TwoPictures two;
    const auto source = NewFrame<CForeignFrame>();
    EXPECT_EQ(two.a->SwapOrCopy(source.get()), 0);
    EXPECT_EQ(FirstBytes(*two.a, 28), Pattern(28));
    EXPECT_EQ(two.a->GetMetaInfo().rectCapture, (TVLRect{1, 2, 3, 4}));
}

TEST(ShareFrameSwap, WithItselfChangesNothing) {
    TwoPictures two;
    EXPECT_EQ(two.a->SwapOrCopy(two.a.get()), 0);
    EXPECT_EQ(SizeOf(*two.a), (TVLSize{10, 10}));
    EXPECT_EQ(two.a->GetTimestamp(), 11u);
    EXPECT_EQ(CapacityOf(*two.a), 480);
    EXPECT_EQ(FirstBytes(*two.a, 480), Pattern(480));
}

TEST(ShareFrameSwap, WithItselfOnAttachedMemoryKeepsThePicture) {
    TwoPictures two;
    Bytes memory = Pattern(480, 4);
    two.a->SetExternalBuf(memory.data(), 480);
    EXPECT_EQ(two.a->SwapOrCopy(two.a.get()), 0);
    EXPECT_EQ(memory, Pattern(480, 4));
}

class CCopyingFrame : public CShareFrame {
public:
    int CopyIShareFrame(IShareFrame*) override { return 42; }
};

TEST(ShareFrameSwap, CopiesThroughTheVirtualOperation) {
    TwoPictures two;
    const auto frame = NewFrame<CCopyingFrame>();
    EXPECT_EQ(frame->SwapOrCopy(nullptr), 42);
    EXPECT_EQ(frame->SwapOrCopy(two.a.get()), 0) << "own memory on both sides is exchanged";
    EXPECT_EQ(FirstBytes(*frame, 480), Pattern(480));
}

} // namespace
