// SPDX-License-Identifier: Apache-2.0
#include "tools/capture_sink.h"
#include "tests/support/threads.h"
#include "tests/tool/capture_frames.h"
#include "tools/capture_engine.h"
#include "tools/capture_status_line.h"
#include "tools/capture_words.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <functional>
#include <new>
#include <thread>

namespace {

/// Does what the test says with each frame, and counts those that went well.
class ScriptedWriter : public FrameWriter {
public:
    WriteResult Write(IShareFrame&) override {
        WriteResult result = script();
        m_frames += result ? 0 : 1;
        return result;
    }
    WriteResult Finish(unsigned) override { return std::nullopt; }

    std::function<WriteResult()> script = [] { return std::nullopt; };
};

class CaptureSinks : public testing::Test {
protected:
    static void Deliver(CaptureSink& sink, TVLSize size = {4, 2}) {
        TVLRect update{};
        sink.OnCaptureData(PlainFrame(size, {1, 2, 3, 255}, 1).get(), update);
    }
    /// What a status line has put into its file.
    static std::string Told(bool isTerminal, const std::function<void(StatusLine&)>& use) {
        std::FILE* const file = std::tmpfile();
        StatusLine line(file, isTerminal);
        use(line);
        std::rewind(file);
        std::array<char, 1000> text{};
        const std::size_t length = std::fread(text.data(), 1, text.size(), file);
        std::fclose(file);
        return {text.data(), length};
    }

    ScriptedWriter writer;
    StopFlag ended;
};

} // namespace

TEST_F(CaptureSinks, EndWithTheLastFrameThatIsWanted) {
    CaptureSink sink(writer, 3, ended);
    Deliver(sink);
    Deliver(sink);
    EXPECT_FALSE(ended.IsRaised());
    Deliver(sink);
    EXPECT_TRUE(ended.IsRaised());
    Deliver(sink);
    EXPECT_EQ(writer.FrameCount(), 3);
    EXPECT_FALSE(sink.Close().has_value());
}

TEST_F(CaptureSinks, EndWithTheFirstFailureAndTellIt) {
    CaptureSink sink(writer, 0, ended);
    Deliver(sink);
    writer.script = [] { return WriteFailure{EXIT_CODE_READER_GONE, "gone"}; };
    Deliver(sink);
    EXPECT_TRUE(ended.IsRaised());
    writer.script = [] { return std::nullopt; };
    Deliver(sink);
    EXPECT_EQ(writer.FrameCount(), 1);
    const WriteResult failure = sink.Close();
    ASSERT_TRUE(failure.has_value());
    EXPECT_EQ(failure->code, EXIT_CODE_READER_GONE);
    EXPECT_EQ(failure->text, "gone");
}

TEST_F(CaptureSinks, TurnWhatAWriterThrowsIntoAFailure) {
    CaptureSink sink(writer, 0, ended);
    writer.script = []() -> WriteResult { throw std::bad_alloc(); };
    EXPECT_NO_THROW(Deliver(sink));
    EXPECT_TRUE(ended.IsRaised());
    const WriteResult failure = sink.Close();
    ASSERT_TRUE(failure.has_value());
    EXPECT_EQ(failure->code, EXIT_CODE_FAILED);
}

TEST_F(CaptureSinks, PassOverFramesWithoutPixels) {
    CaptureSink sink(writer, 1, ended);
    Deliver(sink, {0, 0});
    EXPECT_EQ(writer.FrameCount(), 0);
    EXPECT_FALSE(ended.IsRaised());
}

TEST_F(CaptureSinks, WriteNothingAfterClose) {
    CaptureSink sink(writer, 0, ended);
    EXPECT_FALSE(sink.Close().has_value());
    Deliver(sink);
    EXPECT_EQ(writer.FrameCount(), 0);
}

TEST_F(CaptureSinks, WaitInCloseForAFrameThatIsBeingWritten) {
    CaptureSink sink(writer, 0, ended);
    CTally begun;
    CTally mayEnd;
    writer.script = [&]() -> WriteResult {
        begun.Add();
        EXPECT_TRUE(mayEnd.Reaches(1));
        return std::nullopt;
    };
    std::thread worker([&] { Deliver(sink); });
    ASSERT_TRUE(begun.Reaches(1));
    sink.OnCaptureStatusChanged(1); // events don't wait for it
    EXPECT_EQ(sink.EventCount(), 1);
    mayEnd.Add();
    EXPECT_FALSE(sink.Close().has_value());
    EXPECT_EQ(writer.FrameCount(), 1);
    worker.join();
}

TEST_F(CaptureSinks, TellEventsInWordsAndWhatIsToldOverAndOverOnce) {
    CaptureSink sink(writer, 0, ended);
    sink.OnCaptureStatusChanged(SHARE_CAPTURE_ENGINE_STATUS_STARTED);
    sink.OnCaptureDisplaySizeChanged({80, 40});
    sink.OnCapturePositionChanged(1, -2, 80, 40);
    sink.OnCapturedWindowListChanged(nullptr, 0);
    sink.AddNote("a note");
    for (int i = 0; i < 100; ++i)
        sink.OnCaptureEvent(SHARE_CAPTURE_EVENT_CONTENT_UNAVAILABLE, SHARE_CAPTURE_DRAGGING, nullptr);
    sink.OnCaptureError(SHARE_CAPTURE_DISPLAY_GONE);
    EXPECT_EQ(sink.TakeNotes(),
              (std::vector<std::string>{"started", "what is shared measures 80x40",
                                        "what is shared lies at 1,-2, 80x40", "windows in the picture: 0",
                                        "a note", "nothing to show just now: windows are being dragged",
                                        "the captured monitor has gone (-203)"}));
    EXPECT_EQ(sink.TakeNotes(), std::vector<std::string>{});
    EXPECT_EQ(sink.EventCount(), 105);
}

TEST_F(CaptureSinks, KeepNoMoreThanAThousandNotes) {
    CaptureSink sink(writer, 0, ended);
    for (int i = 0; i < 1500; ++i)
        sink.OnCaptureEvent(7000, i, nullptr);
    const std::vector<std::string> notes = sink.TakeNotes();
    ASSERT_EQ(notes.size(), 1000u);
    EXPECT_EQ(notes.back(), "event (7000): 1499");
}

TEST(CaptureWords, NameWhatIsKnownAndNumberTheRest) {
    EXPECT_EQ(StatusWords(SHARE_CAPTURE_ENGINE_STATUS_PAUSED), "paused");
    EXPECT_EQ(StatusWords(9), "status (9)");
    EXPECT_EQ(ErrorWords(SHARE_CAPTURE_NO_SHARED_APP), "no shared application is left (-204)");
    EXPECT_EQ(ErrorWords(-99), "error (-99)");
    EXPECT_EQ(EventWords(1, 1), "shared windows lie on several monitors");
    EXPECT_EQ(EventWords(1, 0), "shared windows no longer lie on several monitors");
    EXPECT_EQ(EventWords(1001, SHARE_CAPTURE_NO_DATA), "nothing to show just now: there is no picture yet");
    EXPECT_EQ(EventWords(1001, 5), "nothing to show just now (5)");
    EXPECT_EQ(EventWords(42, 5), "event (42): 5");
}

TEST(CaptureWords, FitTheStateOfACaptureIntoALineOfATerminal) {
    CaptureProgress progress;
    progress.statistic.nCaptureWidth = 7680;
    progress.statistic.nCaptureHeight = 4320;
    progress.statistic.nTotalFrames = 60;
    progress.statistic.nDuplicateFrames = 7;
    progress.seconds = 2;
    progress.events = 5;
    EXPECT_EQ(ProgressLine(progress), "30 fps  7680x4320  delivered 60  duplicates 7  events 5")
        << "the engine has measured nothing yet";
    progress.statistic.nCaptureFps = 29;
    progress.statistic.nTotalFrames = 100'000'000;
    progress.statistic.nDuplicateFrames = 100'000'000;
    EXPECT_LT(ProgressLine(progress).size(), 80u);
    EXPECT_EQ(ProgressLine(progress).substr(0, 6), "29 fps");
}

TEST(CaptureWords, SayInTheEndWhatWasDone) {
    CaptureProgress progress;
    progress.statistic = {12, 33, 2, 4, 640, 480, 30, 3, 2, SCREEN_CAPTURER_TYPE_DEFAULT};
    progress.seconds = 0.5;
    progress.framesWritten = 11;
    progress.bytesWritten = 2'500'000;
    EXPECT_EQ(FinalStatistics(progress, "a.y4m"),
              "  delivered   12 frames in 0.5 s, 24.0 a second\n"
              "  duplicates  3\n"
              "  last size   640x480\n"
              "  mean times  capture 4 ms, delivery 2 ms, between frames 33 ms\n"
              "  events      0\n"
              "  mode        default, after another one failed\n"
              "  written     11 frames, 2.5 MB, a.y4m\n");
    EXPECT_EQ(FinalStatistics({}, "").find("written"), std::string::npos);
}

TEST_F(CaptureSinks, ShowALineThatChangesOnTerminalsOnly) {
    const auto use = [](StatusLine& line) {
        line.Show("one");
        line.Tell("news");
        line.Show("two");
        line.Show("two");
        line.Clear();
    };
    EXPECT_EQ(Told(false, use), "screenshare: news\n");
    EXPECT_EQ(Told(true, use), "\r\x1b[Kone\r\x1b[Kscreenshare: news\n\r\x1b[Kone\r\x1b[Ktwo\r\x1b[K");
}

TEST(CaptureOptions, TakeSizesAndNothingElse) {
    EXPECT_EQ(ParseSize("1280x720"), (TVLSize{1280, 720}));
    EXPECT_EQ(ParseSize("1x32767"), (TVLSize{1, 32767}));
    for (const char* const text : {"", "x", "1280", "1280x", "x720", "0x1", "1x0", "-1x5", "+1x5", " 1x5",
                                   "1x5 ", "1x5x6", "32768x1", "1.5x2", "1X2", "99999999999x1"})
        EXPECT_FALSE(ParseSize(text).has_value()) << text;
}

TEST(CaptureOptions, NameEachWayOfCapturingOnce) {
    for (const std::string& name : CaptureModeNames()) {
        const auto mode = CaptureModeOf(name);
        ASSERT_TRUE(mode.has_value()) << name;
        EXPECT_EQ(CaptureModeName(*mode), name);
    }
    EXPECT_EQ(CaptureModeOf("mix"), SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX);
    EXPECT_FALSE(CaptureModeOf("fast").has_value());
}

TEST(CaptureOptions, LeadToTheKindOfEngineThatSharesWhatIsAskedFor) {
    EXPECT_EQ(EngineTypeOf({.monitor = 1}), SHARE_CAPTURE_ENGINE_TYPE_DESKTOP);
    EXPECT_EQ(EngineTypeOf({.apps = {5}}), SHARE_CAPTURE_ENGINE_TYPE_APP);
    EXPECT_EQ(EngineTypeOf({.windows = {5}}), SHARE_CAPTURE_ENGINE_TYPE_WINDOW);
}
