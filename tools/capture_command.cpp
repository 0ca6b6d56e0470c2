// SPDX-License-Identifier: Apache-2.0
#include "tools/capture_command.h"

#include "src/share_util.h"
#include "tools/capture_engine.h"
#include "tools/capture_png_writer.h"
#include "tools/capture_raw_writer.h"
#include "tools/capture_sink.h"
#include "tools/capture_status_line.h"
#include "tools/capture_words.h"
#include "tools/capture_y4m_writer.h"
#include "tools/desktop_state.h"
#include "tools/standard_output.h"

#include <screenshare/share_engine.h>

#include <poll.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <memory>
#include <optional>

namespace {

using Clock = std::chrono::steady_clock;

/// How often the line on the terminal, and what else there is to tell, is brought up to date.
constexpr std::chrono::milliseconds REFRESH{250};

std::string TargetName(const CaptureOptions& options) {
    return options.target == "-" ? "standard output" : options.target;
}

/// A capture from its start to its statistics.
class Capture {
public:
    explicit Capture(CaptureOptions options)
        : m_options(std::move(options)),
          m_writer(MakeWriter()),
          m_sink(*m_writer, m_options.frames, m_ended),
          m_status(stderr, isatty(STDERR_FILENO) == 1) {}

    ExitCode Run();

private:
    std::unique_ptr<FrameWriter> MakeWriter();
    EngineAnswer Prepare();
    EngineAnswer Start();
    void WaitForEnd();
    void TellNews();
    ExitCode TakeDown();
    CaptureProgress Progress() const;
    WriteResult TellStatistics(const CaptureProgress& progress) const;
    ExitCode Fail(ExitCode code, const std::string& problem);

    CaptureOptions m_options;
    std::optional<StopSignals> m_signals;
    StopFlag m_ended; // by the sink
    StopFlag m_stop;  // for who still writes
    std::unique_ptr<FrameWriter> m_writer;
    CaptureSink m_sink;
    StatusLine m_status;
    EngineHandle m_engine; // goes before its sink
    Clock::time_point m_start;
    bool m_isReaderGone = false;
};

std::unique_ptr<FrameWriter> Capture::MakeWriter() {
    switch (m_options.form) {
        case CaptureForm::Png:
            return std::make_unique<PngFolderWriter>(m_options.target);
        case CaptureForm::Y4m:
            return std::make_unique<Y4mWriter>(m_options.target,
                                               Y4mWriter::Form{m_options.fps, m_options.frames}, m_stop);
        case CaptureForm::Raw:
            return std::make_unique<RawWriter>(m_options.target, m_stop,
                                               [this](const std::string& note) { m_sink.AddNote(note); });
        case CaptureForm::Nothing:
            break;
    }
    return std::make_unique<FrameCounter>();
}

EngineAnswer Capture::Prepare() {
    if (const std::string problem = ProblemBeforeLook(); !problem.empty())
        return {EXIT_CODE_FAILED, problem};
    const DesktopLook look;
    if (const std::string misfit = CompleteRequest(m_options.request); !misfit.empty()) {
        // What isn't there may only have gone with everything else.
        const std::string problem = look.ProblemSince();
        return {EXIT_CODE_FAILED, problem.empty() ? misfit : problem};
    }
    m_engine.reset(CreateShareCaptureEngine(EngineTypeOf(m_options.request)));
    if (m_engine == nullptr)
        return {EXIT_CODE_FAILED, "there is no engine for that"};
    if (m_options.target == "-" && isatty(STDOUT_FILENO) == 1)
        return {EXIT_CODE_MISUSED, "standard output is a terminal; frames need a file or a pipe"};
    return SetUpEngine(*m_engine, m_options, m_sink);
}

EngineAnswer Capture::Start() {
    // Opening a named pipe may take until somebody reads it: signals still end the process then.
    if (const WriteResult failure = m_writer->Open())
        return {failure->code, failure->text};
    m_signals.emplace();
    m_start = Clock::now();
    return StartEngine(*m_engine);
}

ExitCode Capture::Run() {
    for (const auto step : {&Capture::Prepare, &Capture::Start}) {
        if (const EngineAnswer answer = (this->*step)(); answer.code != EXIT_CODE_DONE)
            return Fail(answer.code, answer.problem);
    }
    WaitForEnd();
    return TakeDown();
}

/// Until a signal, the sink, the clock or the reader of a pipe says so.
void Capture::WaitForEnd() {
    const bool isLimited = m_options.seconds > 0;
    const Clock::time_point end = m_start + std::chrono::seconds(m_options.seconds);
    while (true) {
        auto wait = REFRESH;
        if (isLimited) {
            const auto left = std::chrono::ceil<std::chrono::milliseconds>(end - Clock::now());
            if (left.count() <= 0)
                return;
            wait = std::min(wait, left);
        }
        // A negative descriptor is one that poll passes over.
        std::array<pollfd, 3> descriptors{{{m_signals->Descriptor(), POLLIN, 0},
                                           {m_ended.Descriptor(), POLLIN, 0},
                                           {m_writer->PipeDescriptor(), 0, 0}}};
        poll(descriptors.data(), descriptors.size(), static_cast<int>(wait.count()));
        m_isReaderGone = descriptors[2].revents != 0;
        if (m_isReaderGone || descriptors[0].revents != 0 || descriptors[1].revents != 0)
            return;
        TellNews();
    }
}

void Capture::TellNews() {
    for (const std::string& note : m_sink.TakeNotes())
        m_status.Tell(note);
    m_status.Show(ProgressLine(Progress()));
}

CaptureProgress Capture::Progress() const {
    CaptureProgress progress;
    m_engine->GetShareCaptureStatistic(progress.statistic);
    progress.seconds = std::chrono::duration<double>(Clock::now() - m_start).count();
    progress.events = m_sink.EventCount();
    return progress;
}

ExitCode Capture::TakeDown() {
    m_stop.Raise();
    WriteResult failure = m_sink.Close();
    // Stop forgets the statistics; these speak of the very frames that were written.
    CaptureProgress progress = Progress();
    m_engine.reset();
    if (!failure)
        failure = m_writer->Finish(ShareUtil::GetCaptureFrameTimeStamp());
    if (!failure && m_isReaderGone)
        failure = FailureFromErrno(TargetName(m_options), EPIPE);
    progress.framesWritten = m_writer->FrameCount();
    progress.bytesWritten = m_writer->BytesWritten();
    for (const std::string& note : m_sink.TakeNotes())
        m_status.Tell(note);
    m_status.Clear();
    const WriteResult untold = TellStatistics(progress);
    if (!failure)
        failure = untold;
    return failure ? Fail(failure->code, failure->text) : EXIT_CODE_DONE;
}

WriteResult Capture::TellStatistics(const CaptureProgress& progress) const {
    const std::string target = TargetName(m_options);
    if (!m_options.tellsJson) {
        std::fputs(FinalStatistics(progress, target).c_str(), stderr);
        return std::nullopt;
    }
    const std::string line = StatisticsJson(progress, target) + "\n";
    if (m_options.target != "-")
        return PrintAnswer(line, m_stop);
    std::fputs(line.c_str(), stderr);
    return std::nullopt;
}

ExitCode Capture::Fail(ExitCode code, const std::string& problem) {
    m_status.Tell(problem);
    return code;
}

} // namespace

ExitCode RunCapture(CaptureOptions options) {
    return Capture(std::move(options)).Run();
}
