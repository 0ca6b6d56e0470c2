// SPDX-License-Identifier: Apache-2.0
#include "src/share_frame_note.h"

#include "src/share_frame.h"
#include "src/share_frame_queue.h"
#include "src/share_ref.h"

#include <screenshare/share_graphic_util.h>

#include <gtest/gtest.h>

#include <array>
#include <memory>
#include <string>
#include <utility>
#include <vector>

namespace {

class CNumberNote final : public ShareFrameNote {
public:
    explicit CNumberNote(int number) : m_number(number) {}
    bool IsSameAs(const ShareFrameNote& other) const override {
        const auto* const note = dynamic_cast<const CNumberNote*>(&other);
        return note != nullptr && note->m_number == m_number;
    }
    int Number() const { return m_number; }

private:
    const int m_number;
};

using Held = ShareRef<CShareFrame>;

Held NewFrame(bool allowsNote = true) {
    Held frame(new CShareFrame);
    frame.Get()->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    frame.Get()->SetFrameSize(8, 4);
    if (allowsNote)
        frame.Get()->AllowNote();
    return frame;
}

void Put(CShareFrame& frame, int number = 1) {
    frame.PutNote(std::make_unique<CNumberNote>(number));
}

/// 0 without a note.
int TakeNumber(CShareFrame& frame) {
    const std::unique_ptr<ShareFrameNote> note = frame.TakeNote();
    return note != nullptr ? dynamic_cast<const CNumberNote&>(*note).Number() : 0;
}

class FrameNote : public testing::Test {
protected:
    FrameNote() { Put(*frame); }

    Held held = NewFrame();
    CShareFrame* const frame = held.Get();
    std::array<unsigned char, 8 * 4 * 4> pixels{};
    TVLRect area{1, 1, 3, 3};
};

} // namespace

TEST_F(FrameNote, IsThereUntilItIsTaken) {
    EXPECT_TRUE(frame->HasNote());
    EXPECT_EQ(TakeNumber(*frame), 1);
    EXPECT_FALSE(frame->HasNote());
    EXPECT_EQ(TakeNumber(*frame), 0);
}

TEST_F(FrameNote, OutlastsReadingAndWhatIsNoPixel) {
    frame->ReadFrameData(pixels.data(), static_cast<int>(pixels.size()));
    frame->ReadFrameLineData(1, pixels.data(), 32);
    frame->ReadFrameAreaData(area, pixels.data(), 16);
    frame->SetTimestamp(7);
    frame->SetMetaInfo({{1, 2, 3, 4}, true});
    frame->SetFrameSize(8, 4);
    frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    frame->GetFrameData()[0] = 1; // nobody can see that; contracts forbid it
    EXPECT_EQ(frame->WriteFrameData(nullptr, 1), 0) << "refused";
    EXPECT_EQ(frame->SetFrameLineBytes(1), -1) << "refused";
    EXPECT_TRUE(frame->HasNote());
}

TEST_F(FrameNote, GoesWithEveryWrite) {
    EXPECT_GT(frame->WriteFrameData(pixels.data(), 4), 0);
    EXPECT_FALSE(frame->HasNote());
    Put(*frame);
    EXPECT_GT(frame->WriteFrameLineData(1, pixels.data(), 32), 0);
    EXPECT_FALSE(frame->HasNote());
    Put(*frame);
    EXPECT_GT(frame->WriteFrameAreaData(area, pixels.data(), 16), 0);
    EXPECT_FALSE(frame->HasNote());
    Put(*frame);
    EXPECT_EQ(frame->CopyIShareFrame(NewFrame().Get()), 0);
    EXPECT_FALSE(frame->HasNote());
}

TEST_F(FrameNote, GoesWithEveryChangeOfTheGeometry) {
    frame->SetFrameSize(8, 3);
    EXPECT_FALSE(frame->HasNote());
    Put(*frame);
    frame->SetFrameSize(TVLSize{80, 30});
    EXPECT_FALSE(frame->HasNote()) << "other memory, too";
    Put(*frame);
    frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_BGRA);
    EXPECT_FALSE(frame->HasNote());
    Put(*frame);
    EXPECT_EQ(frame->SetFrameLineBytes(400), 0);
    EXPECT_FALSE(frame->HasNote());
    Put(*frame);
    frame->Reset();
    EXPECT_FALSE(frame->HasNote());
}

TEST_F(FrameNote, IsNotKeptByMemoryOfTheClient) {
    EXPECT_EQ(frame->SetExternalBuf(pixels.data(), static_cast<int>(pixels.size())), 0);
    EXPECT_FALSE(frame->HasNote());
    EXPECT_FALSE(frame->AllowsNote());
    Put(*frame);
    EXPECT_FALSE(frame->HasNote());
    frame->SetExternalBuf(nullptr, 0);
    EXPECT_TRUE(frame->AllowsNote());
    EXPECT_FALSE(frame->HasNote());
}

TEST_F(FrameNote, IsNotKeptByFramesOfClients) {
    const Held client = NewFrame(false);
    Put(*client.Get());
    EXPECT_FALSE(client.Get()->HasNote());
}

TEST_F(FrameNote, GoesAlongWithPixelsThatAreSwapped) {
    const Held other = NewFrame();
    Put(*other.Get(), 2);
    EXPECT_EQ(frame->SwapOrCopy(other.Get()), 0);
    EXPECT_EQ(TakeNumber(*frame), 2);
    EXPECT_EQ(TakeNumber(*other.Get()), 1);
    Put(*other.Get(), 3);
    frame->SwapOrCopy(other.Get());
    EXPECT_EQ(TakeNumber(*frame), 3);
    EXPECT_EQ(TakeNumber(*other.Get()), 0);
}

TEST_F(FrameNote, IsLostInSwapsWithFramesOfClients) {
    for (const bool isMine : {true, false}) {
        const Held client = NewFrame(false);
        Put(*frame);
        if (isMine)
            frame->SwapOrCopy(client.Get());
        else
            client.Get()->SwapOrCopy(frame);
        EXPECT_FALSE(frame->HasNote());
        EXPECT_FALSE(client.Get()->HasNote());
    }
}

TEST_F(FrameNote, IsNotCopied) {
    const Held other = NewFrame();
    other.Get()->CopyIShareFrame(frame);
    EXPECT_FALSE(other.Get()->HasNote());
    EXPECT_TRUE(frame->HasNote());
    EXPECT_EQ(other.Get()->SetExternalBuf(pixels.data(), static_cast<int>(pixels.size())), 0);
    other.Get()->SwapOrCopy(frame);
    EXPECT_FALSE(other.Get()->HasNote()) << "a swap that can only copy";
    EXPECT_TRUE(frame->HasNote());
}

TEST_F(FrameNote, IsDroppedByBlendsIntoTheFrame) {
    const Held pointer = NewFrame();
    pointer.Get()->SetFrameSize(2, 2);
    EXPECT_TRUE(TvlGraphicUtil::TvlAlphaBlend(frame, 1, 1, pointer.Get()));
    EXPECT_FALSE(frame->HasNote());
}

TEST_F(FrameNote, CountsOnlyIfItWasPutByWhoFilledTheFrame) {
    frame->BeginFilling();
    frame->EndFilling();
    EXPECT_FALSE(frame->HasNote()) << "of before";
    frame->BeginFilling();
    Put(*frame);
    frame->EndFilling();
    EXPECT_TRUE(frame->HasNote());
    const Held queued = NewFrame();
    Put(*queued.Get(), 2);
    frame->BeginFilling();
    frame->SwapOrCopy(queued.Get());
    frame->EndFilling();
    EXPECT_EQ(TakeNumber(*frame), 2) << "filled elsewhere";
}

TEST_F(FrameNote, SavesTheComparisonOnlyIfItIsTheSame) {
    const Held other = NewFrame();
    other.Get()->GetFrameData()[5] = 1;
    EXPECT_FALSE(frame->HasSameData(*other.Get()));
    Put(*other.Get(), 1);
    EXPECT_TRUE(frame->HasSameData(*other.Get())) << "nobody has looked";
    Put(*other.Get(), 2);
    EXPECT_FALSE(frame->HasSameData(*other.Get()));
    other.Get()->GetFrameData()[5] = 0;
    EXPECT_TRUE(frame->HasSameData(*other.Get())) << "other notes prove nothing";
    Put(*other.Get(), 1);
    other.Get()->SetFrameSize(8, 3);
    EXPECT_FALSE(frame->HasSameData(*other.Get()));
}

TEST(FrameNoteOfQueue, IsKeptByItsFrames) {
    ShareFrameQueue queue(2);
    const ShareRef<CShareFrame> frame(dynamic_cast<CShareFrame*>(queue.popFreeFrame()));
    ASSERT_NE(frame.Get(), nullptr);
    EXPECT_TRUE(frame.Get()->AllowsNote());
    frame.Get()->Release(); // what the queue has given
}
