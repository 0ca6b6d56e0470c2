// SPDX-License-Identifier: Apache-2.0
#include "src/mac/avfoundation/share_avf_capturer.h"

#include "src/share_util.h"
#include "tests/src/mac/avfoundation/avf_capturer_rig.h"

#include <algorithm>
#include <new>

/// What becomes of a session's samples: which are kept, which may be looked at, and how one gets into a
/// frame.

namespace {

using namespace platform;

constexpr std::size_t WIDTH = 4;
constexpr std::size_t HEIGHT = 3;
constexpr std::size_t PADDING = 8;
constexpr std::size_t ROW = WIDTH * 4 + PADDING;

constexpr const char* UNREADABLE = "[ShareAVFCapturer captureToIShareFrame] access image buffer failed";

CVPixelBufferRef MakePicture(std::uint8_t content) {
    const auto bytes = std::make_shared<std::vector<std::uint8_t>>(ROW * HEIGHT, content);
    return CVPixelBufferCreateWithBytes(WIDTH, HEIGHT, kCVPixelFormatType_32ARGB, ROW,
                                        {bytes, bytes->data()});
}

/// A frame that finds no memory for its pixels.
class CFrameWithoutMemory final : public CShareFrame {
public:
    using CShareFrame::SetFrameSize;
    int SetFrameSize(int, int) override { throw std::bad_alloc(); }
};

/// A session that runs and gives nothing; the test is the one who delivers.
class AVFSamples : public CAVFCapturerRig {
protected:
    AVFSamples() { StartSilent(); }

    void Deliver(const CMSampleBufferRef& sample) { capturer->captureOutput(nullptr, sample, nullptr); }
    void Deliver(std::uint8_t content) { Deliver(CMSampleBufferCreate(MakePicture(content), {})); }

    /// Whether nobody has the picture open.
    static bool IsClosed(const CVPixelBufferRef& picture) {
        return CVPixelBufferUnlockBaseAddress(picture.get(), kCVPixelBufferLock_ReadOnly) ==
               kCVReturnInvalidArgument;
    }
    /// The first byte of the next picture, or why there is none.
    int Next() {
        const auto code = static_cast<int>(Capture());
        return code == 0 ? frame.Get()->GetFrameData()[0] : code;
    }
    bool ShowsOnly(std::uint8_t content) {
        const unsigned char* const data = frame.Get()->GetFrameData();
        return std::all_of(data, data + frame.Get()->GetFrameDataLen(),
                           [content](unsigned char each) { return each == content; });
    }
    /// Has the frame hold a picture of its own.
    void FillFrame() {
        frame.Get()->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
        frame.Get()->SetFrameSize(2, 2);
        frame.Get()->SetTimestamp(77);
        std::fill_n(frame.Get()->GetFrameData(), frame.Get()->GetFrameDataLen(), std::uint8_t{9});
    }
    void ExpectFilledFrame() {
        EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{2, 2}));
        EXPECT_EQ(frame.Get()->GetFrameDataFormat(), SHARE_FRAME_FORMAT_RGBA);
        EXPECT_EQ(frame.Get()->GetFrameLineBytes(), 8);
        EXPECT_EQ(frame.Get()->GetTimestamp(), 77u);
        EXPECT_TRUE(ShowsOnly(9));
    }
    std::size_t CountUnreadable(const CTraceLog& trace) const {
        const Lines lines = trace.LinesContaining(UNREADABLE);
        EXPECT_TRUE(AreAllAt(lines, Warning(UNREADABLE), FILE_OF_SAMPLES));
        return lines.size();
    }
};

/// Samples that are told apart by what they show of the desktop.
class AVFGate : public AVFSamples {
protected:
    static constexpr std::uint64_t WALKED = 5;
    static constexpr CGRect PLACE{{0, 0}, {40, 30}};

    AVFGate() { capturer->setGate(ShareSampleGate{WALKED, {0, 0, 40, 30}}); }

    void DeliverOf(CMSampleBufferGenerations generations, const CGRect& place = PLACE) {
        Deliver(CMSampleBufferCreate(MakePicture(1), generations, place));
    }
    unsigned CaptureOf(CMSampleBufferGenerations generations, const CGRect& place = PLACE) {
        DeliverOf(generations, place);
        return Capture();
    }
};

} // namespace

// ---- The two that are kept

TEST_F(AVFSamples, AreTakenInTheirOrder) {
    Deliver(1);
    Deliver(2);
    EXPECT_EQ(Next(), 1);
    Deliver(3);
    EXPECT_EQ(Next(), 2);
    EXPECT_EQ(Next(), 3);
    EXPECT_EQ(Capture(), NO_DATA);
}

TEST_F(AVFSamples, AreTwoAtMost) {
    const CMSampleBufferRef oldest = CMSampleBufferCreate(MakePicture(1), {});
    Deliver(oldest);
    Deliver(2);
    EXPECT_EQ(oldest.use_count(), 2);
    Deliver(3);
    EXPECT_EQ(oldest.use_count(), 1) << "it is released";
    EXPECT_EQ(Next(), 2);
    EXPECT_EQ(Next(), 3);
    EXPECT_EQ(Capture(), NO_DATA);
}

TEST_F(AVFSamples, AreReleasedOnceTheyAreCopied) {
    const CMSampleBufferRef sample = CMSampleBufferCreate(MakePicture(1), {});
    Deliver(sample);
    EXPECT_EQ(Capture(), OK);
    EXPECT_EQ(sample.use_count(), 1);
}

TEST_F(AVFSamples, AreReleasedWithTheCapturer) {
    const CMSampleBufferRef sample = CMSampleBufferCreate(MakePicture(1), {});
    Deliver(sample);
    End();
    EXPECT_TRUE(Comes([&] { return sample.use_count() == 1; }));
}

TEST_F(AVFSamples, AreDroppedOnceTheSessionHasStopped) {
    EXPECT_EQ(capturer->stopRun(), 0);
    const std::string session = Session();
    const CTraceLog trace;
    Deliver(1);
    const Lines lines = trace.LinesContaining("captureOutput"); // the session's notice may come meanwhile
    ASSERT_EQ(lines.size(), 1u);
    EXPECT_TRUE(IsLineAt(
        lines[0],
        Warning("[ShareAVFCapturer captureOutput] capture session has stopped, capture session = " + session),
        FILE_OF_SAMPLES));
    EXPECT_EQ(Capture(), NO_DATA);
}

TEST_F(AVFSamples, SurviveAStopAndAStart) {
    Deliver(1);
    Deliver(2);
    EXPECT_EQ(capturer->stopRun(), 0);
    EXPECT_EQ(Next(), 1);
    StartSilent();
    EXPECT_EQ(Next(), 2);
}

TEST_F(AVFSamples, SurviveTheSameDisplayAsItWas) {
    Deliver(1);
    EXPECT_EQ(capturer->setInputDisplay(MAIN), 0);
    EXPECT_EQ(Next(), 1);
}

TEST_F(AVFSamples, AreDroppedWithTheirDisplay) {
    const CMSampleBufferRef sample = CMSampleBufferCreate(MakePicture(1), {});
    Deliver(sample);
    EXPECT_EQ(capturer->setInputDisplay(SIDE), 0);
    EXPECT_EQ(Capture(), NO_DATA);
    EXPECT_EQ(sample.use_count(), 1);
    Deliver(2);
    EXPECT_EQ(capturer->setInputDisplay(99), -1);
    EXPECT_EQ(Capture(), NO_DATA) << "also for a display that isn't there";
}

TEST_F(AVFSamples, AreDroppedWithTheirResolution) {
    for (const CGSize size : {CGSize{50, 30}, CGSize{50, 40}}) {
        Deliver(1);
        ASSERT_TRUE(desktop->ResizeDisplay(MAIN, size));
        EXPECT_EQ(capturer->setInputDisplay(MAIN), 0);
        EXPECT_EQ(Capture(), NO_DATA);
    }
}

TEST_F(AVFSamples, AreDroppedByBeginningAnew) {
    Deliver(1);
    Deliver(2);
    capturer->beginAnew();
    EXPECT_TRUE(capturer->isRunning());
    EXPECT_EQ(Capture(), NO_DATA);
    Deliver(3);
    EXPECT_EQ(capturer->stopRun(), 0);
    capturer->beginAnew();
    EXPECT_FALSE(capturer->isRunning());
    EXPECT_EQ(Capture(), NO_DATA);
}

// ---- Into a frame

TEST_F(AVFSamples, FillAFrameWithTheirWholeRows) {
    FillFrame();
    Advance(1234);
    Deliver(1);
    EXPECT_EQ(Capture(), OK);
    EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{WIDTH, HEIGHT}));
    EXPECT_EQ(frame.Get()->GetFrameDataFormat(), SHARE_FRAME_FORMAT_ARGB);
    EXPECT_EQ(frame.Get()->GetFrameLineBytes(), static_cast<int>(ROW));
    EXPECT_EQ(frame.Get()->GetFrameDataLen(), static_cast<int>(ROW * HEIGHT));
    EXPECT_EQ(frame.Get()->GetTimestamp(), ShareUtil::GetCaptureFrameTimeStamp());
    EXPECT_TRUE(ShowsOnly(1)) << "what is between the rows included";
}

TEST_F(AVFSamples, FillNoMoreThanTheMemoryThatAFrameWasLent) {
    constexpr int LENT = 20;
    std::vector<unsigned char> memory(LENT + 100, 7);
    EXPECT_EQ(frame.Get()->SetExternalBuf(memory.data(), LENT), 0);
    Deliver(1);
    EXPECT_EQ(Capture(), OK);
    EXPECT_EQ(std::count(memory.begin(), memory.end(), 1), LENT);
    EXPECT_EQ(std::count(memory.begin() + LENT, memory.end(), 7), 100);
}

TEST_F(AVFSamples, AreUsedUpWithoutAFrame) {
    EXPECT_EQ(capturer->captureToIShareFrame(nullptr), NO_DATA);
    const CVPixelBufferRef picture = MakePicture(1);
    Deliver(CMSampleBufferCreate(picture, {}));
    Deliver(2);
    EXPECT_EQ(capturer->captureToIShareFrame(nullptr), FAILED);
    EXPECT_TRUE(IsClosed(picture));
    EXPECT_EQ(Next(), 2);
}

TEST_F(AVFSamples, AreClosedAndReleasedWhenTheFrameFindsNoMemory) {
    const CVPixelBufferRef picture = MakePicture(1);
    const CMSampleBufferRef sample = CMSampleBufferCreate(picture, {});
    Deliver(sample);
    Deliver(2);
    const FrameRef poor(new CFrameWithoutMemory);
    EXPECT_THROW(capturer->captureToIShareFrame(poor.Get()), std::bad_alloc);
    EXPECT_TRUE(IsClosed(picture));
    EXPECT_EQ(sample.use_count(), 1);
    EXPECT_EQ(Next(), 2) << "no lock is left behind";
}

TEST_F(AVFSamples, AreClosedAgain) {
    const CVPixelBufferRef picture = MakePicture(1);
    Deliver(CMSampleBufferCreate(picture, {}));
    EXPECT_EQ(Capture(), OK);
    EXPECT_TRUE(IsClosed(picture));
}

// ---- Those that can't be read

TEST_F(AVFSamples, WithoutAPictureArePassedOver) {
    Deliver(CMSampleBufferCreate(nullptr, {}));
    Deliver(2);
    const CTraceLog trace;
    EXPECT_EQ(Next(), 2);
    EXPECT_EQ(CountUnreadable(trace), 1u);
    EXPECT_EQ(Capture(), NO_DATA);
}

TEST_F(AVFSamples, ThatDoNotOpenArePassedOver) {
    const CMSampleBufferRef closed = CMSampleBufferCreate(MakePicture(1), {});
    Deliver(closed);
    Deliver(2);
    script->Fail(Operation::LockBaseAddress);
    const CTraceLog trace;
    EXPECT_EQ(Next(), 2);
    EXPECT_EQ(CountUnreadable(trace), 1u);
    EXPECT_EQ(closed.use_count(), 1);
}

TEST_F(AVFSamples, FailWhenNoneOfThemOpens) {
    FillFrame();
    Deliver(1);
    Deliver(2);
    script->Fail(Operation::GetImageBuffer);
    script->Fail(Operation::LockBaseAddress);
    const CTraceLog trace;
    EXPECT_EQ(Capture(), FAILED);
    EXPECT_EQ(CountUnreadable(trace), 2u);
    ExpectFilledFrame();
    EXPECT_EQ(Capture(), NO_DATA);
}

TEST_F(AVFSamples, WithoutAnAddressFailAtOnce) {
    FillFrame();
    const CVPixelBufferRef picture = MakePicture(1);
    Deliver(CMSampleBufferCreate(picture, {}));
    Deliver(2);
    script->Fail(Operation::GetBaseAddress);
    const CTraceLog trace;
    EXPECT_EQ(Capture(), FAILED);
    EXPECT_EQ(trace.Lines(), Lines{});
    EXPECT_TRUE(IsClosed(picture));
    ExpectFilledFrame();
    EXPECT_EQ(Next(), 2);
}

TEST_F(AVFSamples, WithShortRowsFailAndLeaveTheFrameAsItIs) {
    FillFrame();
    const CVPixelBufferRef picture = MakePicture(1);
    const CMSampleBufferRef sample = CMSampleBufferCreate(picture, {});
    Deliver(sample);
    Deliver(2);
    script->Fail(Operation::GetBytesPerRow);
    const CTraceLog trace;
    EXPECT_EQ(Capture(), FAILED);
    ASSERT_EQ(trace.Entries().size(), 1u);
    EXPECT_EQ(trace.Entries()[0].tag, std::nullopt);
    EXPECT_TRUE(
        IsLineAt(trace.Lines()[0],
                 ThinnedWarning("[ShareAVFCapturer captureToIShareFrame] bytesPerRow < width * 412, width4"),
                 FILE_OF_SAMPLES));
    EXPECT_TRUE(IsClosed(picture));
    EXPECT_EQ(sample.use_count(), 1);
    ExpectFilledFrame();
    EXPECT_EQ(Next(), 2);
}

TEST_F(AVFSamples, WithShortRowsAreToldOfOnceByEachCapturerAndNowAndThenByAll) {
    if (!IsOnlyTestOfProcess())
        GTEST_SKIP() << "the count belongs to the process";
    script->Fail(Operation::GetBytesPerRow, 1, AVCaptureScript::ALL);
    const CTraceLog trace;
    std::vector<int> told;
    for (int i = 1; i <= 1003; ++i) {
        const std::size_t before = trace.CountContaining("bytesPerRow");
        Deliver(1);
        ASSERT_EQ(Capture(), FAILED);
        if (trace.CountContaining("bytesPerRow") != before)
            told.push_back(i);
    }
    EXPECT_EQ(told, (std::vector<int>{1, 2, 502, 1002}));
    End();
    capturer = std::make_shared<ShareAVFCapturer>();
    StartSilent();
    Deliver(1);
    EXPECT_EQ(Capture(), FAILED);
    EXPECT_EQ(trace.CountContaining("bytesPerRow"), 5u) << "another capturer's first one";
}

TEST_F(AVFSamples, ThatAreMissingAreToldOfEveryTwoHundredTimes) {
    if (!IsOnlyTestOfProcess())
        GTEST_SKIP() << "the count belongs to the process";
    const CTraceLog trace;
    std::vector<int> told;
    for (int i = 1; i <= 402; ++i) {
        const std::size_t before = trace.Lines().size();
        ASSERT_EQ(Capture(), NO_DATA);
        if (trace.Lines().size() != before)
            told.push_back(i);
    }
    EXPECT_EQ(told, (std::vector<int>{1, 201, 401}));
    EXPECT_TRUE(AreAllAt(trace.Lines(),
                         ThinnedWarning("[ShareAVFCapturer captureToIShareFrame] no capture data"),
                         FILE_OF_SAMPLES));
    EXPECT_EQ(trace.Entries()[0].tag, std::nullopt);
}

// ---- Those that may not be seen

TEST_F(AVFGate, LetsThePictureOfTheWalkedWindowsPass) {
    EXPECT_EQ(CaptureOf({WALKED, WALKED}), OK);
}

TEST_F(AVFGate, LetsNoPictureOfOtherWindowsPass) {
    FillFrame();
    const CTraceLog trace;
    EXPECT_EQ(CaptureOf({WALKED - 1, WALKED}), FAILED) << "it may still show what was there before";
    EXPECT_EQ(CaptureOf({WALKED, WALKED + 1}), FAILED);
    EXPECT_EQ(CaptureOf({WALKED - 1, WALKED - 1}), FAILED);
    EXPECT_EQ(CaptureOf({WALKED + 1, WALKED + 1}), FAILED);
    EXPECT_EQ(CaptureOf({0, WALKED}), FAILED);
    EXPECT_EQ(CountUnreadable(trace), 5u);
    ExpectFilledFrame();
    EXPECT_EQ(Capture(), NO_DATA) << "they are used up";
}

TEST_F(AVFGate, LetsNoPictureOfAnotherPlacePass) {
    EXPECT_EQ(CaptureOf({WALKED, WALKED}, {{1, 0}, {40, 30}}), FAILED);
    EXPECT_EQ(CaptureOf({WALKED, WALKED}, {{0, 0}, {40, 31}}), FAILED);
    EXPECT_EQ(CaptureOf({WALKED, WALKED}, {}), FAILED);
    EXPECT_EQ(CaptureOf({WALKED, WALKED}), OK);
}

TEST_F(AVFGate, LetsNothingPassWithoutAWalk) {
    capturer->setGate(ShareSampleGate{0, {0, 0, 40, 30}});
    EXPECT_EQ(CaptureOf({0, 0}), FAILED);
    EXPECT_EQ(CaptureOf({WALKED, WALKED}), FAILED);
}

TEST_F(AVFGate, LooksForAPictureThatMayBeSeen) {
    DeliverOf({WALKED - 1, WALKED});
    Deliver(CMSampleBufferCreate(MakePicture(2), {WALKED, WALKED}, PLACE));
    const CTraceLog trace;
    EXPECT_EQ(Next(), 2);
    EXPECT_EQ(CountUnreadable(trace), 1u);
}

TEST_F(AVFGate, DoesNotOpenWhatMayNotBeSeen) {
    EXPECT_EQ(CaptureOf({0, 0}), FAILED);
    EXPECT_EQ(Calls(Operation::LockBaseAddress), 0u);
}

TEST_F(AVFGate, LetsEverythingPassOnceItIsTakenAway) {
    capturer->setGate(std::nullopt);
    EXPECT_EQ(CaptureOf({0, 0}, {}), OK);
    EXPECT_EQ(CaptureOf({WALKED - 1, WALKED}), OK);
}
