// SPDX-License-Identifier: Apache-2.0
#include "src/share_capture_engine_kinds.h"
#include "src/share_frame.h"
#include "src/share_ref.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <memory>
#include <utility>

/// Which notes of capturers on what a frame shows are believed.

namespace {

class CSomeNote final : public ShareFrameNote {
public:
    bool IsSameAs(const ShareFrameNote&) const override { return true; }
};

void PutNote(IShareFrame* frame) {
    dynamic_cast<CShareFrame&>(*frame).PutNote(std::make_unique<CSomeNote>());
}

bool HasNote(IShareFrame* frame) {
    return dynamic_cast<CShareFrame&>(*frame).HasNote();
}

using CDesktopBench = CEngineBench<CShareCaptureDesktopEngine>;

constexpr std::uint64_t NUMBER = 7;

void PutNumberedNote(IShareFrame* frame) {
    auto note = std::make_unique<CSomeNote>();
    note->SetNumber(NUMBER);
    dynamic_cast<CShareFrame&>(*frame).PutNote(std::move(note));
}

bool ChangeWithPartner(IShareFrame* frame) {
    return dynamic_cast<CShareFrame&>(*frame).ChangeWithPartner(NUMBER);
}

/// Whether a capturer can have a picture that is in the frame before.
template <class Bench>
bool HasFromTheFrameBefore(Bench& bench) {
    bench.BeginInline();
    bench.Passes(2);
    IShareFrame* const before = bench.engine->_GetCurShareFrame();
    bench.capturer.SetHook(PutNumberedNote);
    bench.capturer.SetFill(9); // no duplicate
    bench.Pass();
    const unsigned char* const pixels = before->GetFrameData();
    IShareFrame* const frame = bench.engine->_GetCurShareFrame();
    EXPECT_NE(frame, before);
    bool isHad = false;
    bench.capturer.SetHook([&isHad](IShareFrame* each) { isHad = ChangeWithPartner(each); });
    bench.Pass();
    EXPECT_EQ(frame->GetFrameData() == pixels, isHad);
    EXPECT_NE(before->GetFrameData(), frame->GetFrameData());
    PutNumberedNote(before);
    EXPECT_FALSE(ChangeWithPartner(frame)) << "the pass is over";
    return isHad;
}

} // namespace

TEST(ShareEngineNotes, OfItsOwnCapturerAreKept) {
    CDesktopBench bench;
    bench.BeginInline();
    IShareFrame* const frame = bench.engine->_GetCurShareFrame();
    bench.Passes(2);
    EXPECT_FALSE(HasNote(frame));
    bench.capturer.SetHook(PutNote); // before its picture, which has the size of the one before
    bench.Pass();
    EXPECT_TRUE(HasNote(frame));
}

TEST(ShareEngineNotes, ThatItsOwnCapturerHasNotPutThereAreDropped) {
    CDesktopBench bench;
    bench.BeginInline();
    bench.Passes(2);
    IShareFrame* const frame = bench.engine->_GetCurShareFrame();
    PutNote(frame);
    bench.Pass();
    EXPECT_FALSE(HasNote(frame));
    IShareFrame* const other = bench.engine->_GetCurShareFrame();
    PutNote(other);
    bench.capturer.SetResult(SHARE_CAPTURE_FAILED);
    bench.Pass();
    EXPECT_FALSE(HasNote(other)) << "who fails may have written";
}

TEST(ShareEngineNotes, OfACapturerOfTheClientAreNeverBelieved) {
    CEngineBench<> bench;
    bench.BeginInline();
    bench.capturer.SetHook(PutNote);
    for (int i = 0; i < 4; ++i) {
        IShareFrame* const frame = bench.engine->_GetCurShareFrame();
        bench.Pass();
        EXPECT_FALSE(HasNote(frame));
    }
}

TEST(ShareEngineNotes, ThatAreTheSameMakeDuplicates) {
    CDesktopBench bench;
    bench.engine->m_bCheckDupFrame = true;
    bench.BeginInline();
    bench.Passes(2);
    bench.capturer.SetHook(PutNote);
    bench.capturer.SetFill(1);
    bench.Pass();
    bench.Advance(200);
    bench.capturer.SetFill(2); // whoever looked at the pixels would see it
    const std::size_t before = bench.sink.FrameCount();
    bench.Passes(3);
    EXPECT_EQ(bench.sink.FrameCount(), before + 1) << "the one before had no note";
}

TEST(ShareEngineNotes, AreHadWithThePixelsFromTheFrameBefore) {
    CDesktopBench bench;
    EXPECT_TRUE(HasFromTheFrameBefore(bench));
}

TEST(ShareEngineNotes, StayWithTheFrameThatTheNextOneIsComparedWith) {
    CDesktopBench bench;
    bench.engine->m_bCheckDupFrame = true;
    EXPECT_FALSE(HasFromTheFrameBefore(bench));
}

TEST(ShareEngineNotes, WithoutANumberAreNotHadFromTheFrameBefore) {
    CDesktopBench bench;
    bench.BeginInline();
    bench.capturer.SetHook(PutNote);
    bench.Passes(2);
    bool isHad = true;
    bench.capturer.SetHook(
        [&isHad](IShareFrame* frame) { isHad = dynamic_cast<CShareFrame&>(*frame).ChangeWithPartner(0); });
    bench.Pass();
    EXPECT_FALSE(isHad);
}

TEST(ShareEngineNotes, AreNotHadByACapturerOfTheClient) {
    CEngineBench<> bench;
    EXPECT_FALSE(HasFromTheFrameBefore(bench));
}

TEST(ShareEngineNotes, AreDroppedWithThePointerThatIsComposed) {
    const ShareRef<CShareFrame> picture(new CShareFrame);
    picture.Get()->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    picture.Get()->SetFrameSize(2, 2);
    CDesktopBench bench(true);
    const ShareRef<CFakePointingImg> image(new CFakePointingImg(bench.calls, picture.Get(), 0, 0));
    bench.pointing->image = image.Get();
    bench.BeginInline();
    bench.Passes(2);
    bench.capturer.SetHook(PutNote);
    IShareFrame* const frame = bench.engine->_GetCurShareFrame();
    bench.Pass(SHARE_CAPTURE_MASK_CONTENT | SHARE_CAPTURE_MASK_POINTER);
    ASSERT_TRUE(frame->GetMetaInfo().bPointerCaptured) << "it was composed";
    EXPECT_FALSE(HasNote(frame));
}
