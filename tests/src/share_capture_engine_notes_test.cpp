// SPDX-License-Identifier: Apache-2.0
#include "src/share_capture_engine_kinds.h"
#include "src/share_frame.h"
#include "src/share_ref.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <memory>

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
