// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_cgs_capturer.h"

#include "platform/core_graphics_images.h"
#include "src/share_util.h"
#include "tests/src/mac/backend_tools.h"
#include "tests/support/engine_bench.h"

#include <screenshare/share_capturer.h>

#include <gtest/gtest.h>

#include <atomic>
#include <cstring>
#include <limits>
#include <string>
#include <thread>
#include <vector>

using namespace platform;

namespace {

using Lines = std::vector<std::string>;

constexpr unsigned MAIN = 1;
constexpr unsigned SIDE = 2;
constexpr unsigned FAILED = static_cast<unsigned>(SHARE_CAPTURE_FAILED);
constexpr unsigned EDITOR_WINDOW = 2;
constexpr unsigned NOTES_WINDOW = 3;
constexpr std::uint32_t RED = 0xFF0000;
constexpr std::uint32_t GREEN = 0x00FF00;
constexpr std::uint32_t BLUE = 0x0000FF;
constexpr TVLRect WHOLE_MAIN{0, 0, 200, 120};

/// A wallpaper, the editor's window, that of the notes in front of a part of it; a fine display beside it.
Scene Desk() {
    return Scene()
        .Display(0, 0, 200, 120)
        .Display(200, 10, 100, 50)
        .Scale(2)
        .App(1, "Desktop")
        .Window(1)
        .At(0, 0, 200, 120)
        .Colour(BLUE)
        .Level(SIMULATED_LEVEL_DESKTOP)
        .App(5'000'100, "Editor")
        .Window(EDITOR_WINDOW)
        .At(50, 40, 80, 40)
        .Colour(GREEN)
        .Window(NOTES_WINDOW)
        .At(100, 60, 60, 40)
        .Colour(RED)
        .Pointer(60, 50)
        .Cursor(SquareCursor(0xFFFFFF));
}

class StandAloneCapturer : public testing::Test {
protected:
    StandAloneCapturer() { EXPECT_TRUE(capturer.init()); }

    unsigned Capture(const TVLRect& rect, std::vector<unsigned> windows = {EDITOR_WINDOW}) {
        return capturer.captureScreenRect(rect, static_cast<int>(windows.size()), windows.data(),
                                          frame.Get());
    }
    FramePixel At(int x, int y) { return PixelAt(*frame.Get(), x, y); }

    CManualClockScope clock;
    CSettingsScope settings;
    CServedScene desktop{Desk()};
    ShareCGSCapturer capturer;
    FrameRef frame = NewFrameRef();
};

} // namespace

// ---- Sizes

TEST_F(StandAloneCapturer, StartsOnTheMainDisplayWithoutASize) {
    EXPECT_EQ(capturer.getCaptureDisplay(), MAIN);
    EXPECT_EQ(capturer.getDisplayCaptureRect(), WHOLE_MAIN);
    EXPECT_EQ(capturer.getDisplayCaptureSize(), (TVLSize{200, 120}));
    EXPECT_EQ(capturer.getFrameSize(), (TVLSize{0, 0})) << "nothing is to be captured yet";
    EXPECT_FALSE(capturer.isCaptureWholeDesktop());
    EXPECT_EQ(capturer.getCaptureFormat(), 1);
}

TEST_F(StandAloneCapturer, HasNoSizeWithoutADisplay) {
    ShareCGSCapturer unfit;
    unfit.updateCaptureRect(WHOLE_MAIN);
    EXPECT_EQ(unfit.getFrameSize(), (TVLSize{0, 0}));
    const unsigned window = EDITOR_WINDOW;
    EXPECT_EQ(unfit.captureScreenRect(WHOLE_MAIN, 1, &window, frame.Get()), FAILED);
}

TEST_F(StandAloneCapturer, TracesItsBeginning) {
    const CTraceLog trace;
    ShareCGSCapturer other;
    EXPECT_TRUE(other.init());
    EXPECT_EQ(trace.Lines(), Lines{Info("[ShareCGSCapturer::initScreenSize] displayid=1 fDisplayScale = 1 "
                                        "left = 0 top = 0 width = 200 height = 120")});
}

TEST_F(StandAloneCapturer, MakesHalfOfTheWidthOfHalfOfTheDisplay) {
    const CTraceLog trace;
    capturer.updateCaptureRect({100, 0, 200, 120});
    EXPECT_EQ(capturer.getFrameSize(), (TVLSize{100, 120}));
    capturer.updateCaptureRect({100, 0, 200, 120});
    EXPECT_EQ(trace.Lines(),
              Lines{Info("ShareCGSCapturer.updateCaptureSize m_sizeBmpContext={ w=100 h=120")});
}

TEST_F(StandAloneCapturer, CutsSizesToWholePixelsAndTracesEachScale) {
    capturer.updateCaptureRect({0, 0, 201, 90});
    const CTraceLog trace;
    capturer.setScale(0.33F);
    EXPECT_EQ(capturer.getFrameSize(), (TVLSize{66, 29}));
    capturer.setScale(0.33F);
    EXPECT_EQ(trace.Lines(), (Lines{Info("ShareCGSCapturer.updateCaptureSize m_sizeBmpContext={ w=66 h=29"),
                                    Info("ShareCGSCapturer.setScale m_fCaptureScale=0.33"),
                                    Info("ShareCGSCapturer.setScale m_fCaptureScale=0.33")}));
}

TEST_F(StandAloneCapturer, CountsThePixelsOfAFineDisplay) {
    const CTraceLog trace;
    EXPECT_TRUE(capturer.setCaptureDisplay(SIDE));
    EXPECT_TRUE(capturer.setCaptureDisplay(SIDE));
    EXPECT_EQ(trace.Lines(), Lines{Info("[ShareCGSCapturer::initScreenSize] displayid=2 fDisplayScale = 2 "
                                        "left = 200 top = 10 width = 100 height = 50")});
    EXPECT_EQ(capturer.getDisplayCaptureRect(), (TVLRect{200, 10, 300, 60}));
    EXPECT_EQ(capturer.getDisplayCaptureSize(), (TVLSize{200, 100}));
    capturer.updateCaptureRect({200, 10, 250, 60});
    EXPECT_EQ(capturer.getFrameSize(), (TVLSize{100, 100}));
}

TEST_F(StandAloneCapturer, GivesNoPictureOfASizeThatNoPictureHas) {
    for (const float scale : {-1.0F, 0.0F, std::numeric_limits<float>::quiet_NaN(), 300.0F, 1e30F,
                              std::numeric_limits<float>::infinity()}) {
        capturer.setScale(scale); // 300 makes 60000 x 36000: more than a length can tell
        EXPECT_EQ(Capture(WHOLE_MAIN), FAILED) << scale;
    }
    capturer.setScale(1);
    EXPECT_EQ(Capture(WHOLE_MAIN), 0u);
}

// ---- Captures

TEST_F(StandAloneCapturer, DrawsTheListedWindowsWholeAndNoOther) {
    clock->Advance(std::chrono::milliseconds(1234));
    EXPECT_EQ(Capture(WHOLE_MAIN), 0u);
    EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{200, 120}));
    EXPECT_EQ(CountOf(*frame.Get(), GREEN), 80 * 40) << "what covers it is not listed, nor is the pointer";
    EXPECT_EQ(CountOf(*frame.Get(), 0), 200 * 120 - 80 * 40);
    EXPECT_EQ(At(50, 40), Rgb(GREEN));
    EXPECT_EQ(At(49, 40), Rgb(0));
    EXPECT_EQ(frame.Get()->GetTimestamp(), ShareUtil::GetCaptureFrameTimeStamp());
    EXPECT_TRUE(capturer.isCaptureWholeDesktop());
}

TEST_F(StandAloneCapturer, DrawsWindowsInTheOrderInWhichTheyStand) {
    EXPECT_EQ(Capture({100, 60, 130, 80}, {EDITOR_WINDOW, NOTES_WINDOW}), 0u);
    EXPECT_EQ(CountOf(*frame.Get(), RED), 30 * 20);
    EXPECT_FALSE(capturer.isCaptureWholeDesktop());
}

TEST_F(StandAloneCapturer, ScalesWhatItDraws) {
    capturer.setScale(0.5F);
    EXPECT_EQ(Capture({40, 20, 140, 80}), 0u);
    EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{50, 30}));
    EXPECT_EQ(At(25, 20), Rgb(GREEN));
    EXPECT_EQ(At(2, 2), Rgb(0));
}

TEST_F(StandAloneCapturer, GivesAnImageWithoutAFrame) {
    const unsigned window = EDITOR_WINDOW;
    const CGImageRef image = capturer.captureScreenRect({50, 40, 130, 80}, 1, &window);
    EXPECT_EQ(CGImageGetWidth(image.get()), 80);
    EXPECT_EQ(CGImageGetHeight(image.get()), 40);
    EXPECT_EQ(capturer.getFrameSize(), (TVLSize{80, 40}));
    EXPECT_EQ(capturer.captureScreenRect({50, 40, 130, 80}, 0, &window), nullptr);
    EXPECT_EQ(capturer.captureScreenRect({50, 40, 130, 80}, -1, &window), nullptr);
    EXPECT_EQ(capturer.captureScreenRect({50, 40, 130, 80}, 1, nullptr), nullptr);
}

TEST_F(StandAloneCapturer, FailsWithoutAFrameWindowsOrAnImage) {
    clock->Advance(std::chrono::milliseconds(7));
    const unsigned window = EDITOR_WINDOW;
    EXPECT_EQ(capturer.captureScreenRect(WHOLE_MAIN, 1, &window, nullptr), FAILED);
    EXPECT_EQ(capturer.captureScreenRect(WHOLE_MAIN, 0, &window, frame.Get()), FAILED);
    EXPECT_EQ(capturer.captureScreenRect(WHOLE_MAIN, 1, nullptr, frame.Get()), FAILED);
    desktop->FailNext(SimulatedOperation::TakeWindowPicture);
    EXPECT_EQ(Capture(WHOLE_MAIN), FAILED);
    EXPECT_EQ(frame.Get()->GetTimestamp(), 0u) << "only a picture is stamped";
    EXPECT_EQ(Capture({}), FAILED) << "nothing has no size";
    EXPECT_EQ(Capture(WHOLE_MAIN), 0u);
}

TEST_F(StandAloneCapturer, LeavesNothingOfTheLastPictureInTheFrame) {
    EXPECT_EQ(Capture(WHOLE_MAIN), 0u);
    desktop->MoveWindow(EDITOR_WINDOW, {0, 0});
    EXPECT_EQ(Capture(WHOLE_MAIN), 0u);
    EXPECT_EQ(CountOf(*frame.Get(), GREEN), 80 * 40);
    EXPECT_EQ(At(100, 70), Rgb(0));
}

TEST_F(StandAloneCapturer, TracesHowLongItDrawsWhereThatIsAskedFor) {
    settings->m_nShareConfigFlags = SHARE_CONFIG_FLAG_PERFORMANCE_TRACE;
    EXPECT_EQ(Capture(WHOLE_MAIN), 0u);
    const CTraceLog trace;
    EXPECT_EQ(Capture(WHOLE_MAIN), 0u);
    EXPECT_EQ(trace.Lines(),
              Lines{Info("[Performance]ShareCGSCapturer.CGContextDrawImage usagetime=0 image={w=200 h=120} "
                         "destRect={x=0 y=0 w=200 h=120}")});
}

// ---- The bitmap context

TEST_F(StandAloneCapturer, KeepsItsBitmapContextOnTheSameFrame) {
    EXPECT_EQ(Capture(WHOLE_MAIN), 0u);
    frame.Get()->SetTimestamp(0);
    const unsigned char* const before = frame.Get()->GetFrameData();
    EXPECT_EQ(Capture(WHOLE_MAIN), 0u);
    EXPECT_EQ(frame.Get()->GetFrameData(), before);
    EXPECT_EQ(CountOf(*frame.Get(), GREEN), 80 * 40);
}

TEST_F(StandAloneCapturer, MakesAnotherBitmapContextForAnotherFrameSizeOrFormat) {
    EXPECT_EQ(Capture(WHOLE_MAIN), 0u);
    frame.Get()->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGB);
    EXPECT_EQ(Capture(WHOLE_MAIN), 0u);
    EXPECT_EQ(frame.Get()->GetFrameDataFormat(), SHARE_FRAME_FORMAT_RGBA);
    EXPECT_EQ(frame.Get()->SetFrameLineBytes(1000), 0);
    EXPECT_EQ(Capture(WHOLE_MAIN), 0u);
    EXPECT_EQ(CountOf(*frame.Get(), GREEN), 80 * 40) << "lines lie as the picture has them";
    EXPECT_EQ(Capture({40, 20, 140, 80}), 0u);
    EXPECT_EQ(SizeOf(*frame.Get()), (TVLSize{100, 60}));
    EXPECT_EQ(At(10, 20), Rgb(GREEN));
    frame = NewFrameRef();
    EXPECT_EQ(Capture({40, 20, 140, 80}), 0u);
    EXPECT_EQ(At(10, 20), Rgb(GREEN));
}

// A frame may end, and a smaller one get its memory.
TEST_F(StandAloneCapturer, DrawsNotBeyondAFrameAtTheAddressOfALargerOne) {
    std::vector<unsigned char> memory(200 * 120 * 4);
    EXPECT_EQ(frame.Get()->SetExternalBuf(memory.data(), static_cast<int>(memory.size())), 0);
    EXPECT_EQ(Capture(WHOLE_MAIN), 0u);

    constexpr int SMALL = 50 * 30 * 4;
    frame = NewFrameRef();
    EXPECT_EQ(frame.Get()->SetExternalBuf(memory.data(), SMALL), 0);
    frame.Get()->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    frame.Get()->SetFrameSize(50, 30);
    std::memset(memory.data(), 0xAB, memory.size());
    capturer.setScale(0.25F);
    EXPECT_EQ(Capture(WHOLE_MAIN), 0u);
    EXPECT_EQ(At(20, 12), Rgb(GREEN));
    for (std::size_t i = SMALL; i < memory.size(); ++i)
        ASSERT_EQ(memory[i], 0xAB) << i;
}

TEST_F(StandAloneCapturer, RefusesMemoryThatIsTooShort) {
    std::vector<unsigned char> memory(200 * 120 * 4);
    capturer.updateCaptureRect(WHOLE_MAIN);
    EXPECT_FALSE(capturer.initCapturerByData(memory.data(), 200 * 120 * 4 - 1));
    EXPECT_FALSE(capturer.initCapturerByData(nullptr, 200 * 120 * 4));
    EXPECT_FALSE(capturer.initCapturerByData(memory.data(), -1));
    EXPECT_TRUE(capturer.initCapturerByData(memory.data(), 200 * 120 * 4));
    capturer.setCaptureDisplay(SHARE_INVALID_DISPLAY);
    EXPECT_FALSE(capturer.initCapturerByData(memory.data(), 200 * 120 * 4));
}

TEST_F(StandAloneCapturer, DrawsNothingWithoutADisplay) {
    EXPECT_EQ(Capture(WHOLE_MAIN), 0u);
    capturer.setCaptureDisplay(SHARE_INVALID_DISPLAY);
    frame = NewFrameRef(); // the memory that was drawn on is gone
    EXPECT_EQ(Capture(WHOLE_MAIN), FAILED);
}

TEST_F(StandAloneCapturer, MayBeGivenAnotherScaleWhileItCaptures) {
    std::atomic<bool> isOver{false};
    std::thread other([&] {
        for (int i = 0; !isOver; ++i) {
            capturer.setScale(i % 2 == 0 ? 0.5F : 1.0F);
            capturer.setCaptureDisplay(i % 3 == 0 ? SIDE : MAIN);
        }
    });
    for (int i = 0; i < 200; ++i) {
        EXPECT_EQ(Capture(i % 2 == 0 ? WHOLE_MAIN : TVLRect{40, 20, 140, 80}), 0u);
        EXPECT_GT(CountOf(*frame.Get(), GREEN), 0);
    }
    isOver = true;
    other.join();
}
