// SPDX-License-Identifier: Apache-2.0
#include "tools/demo_command.h"

#include "platform/image_codec.h"
#include "tools/capture_options.h"
#include "tools/capture_status_line.h"
#include "tools/demo_words.h"
#include "tools/desktop_state.h"
#include "tools/explanation_svg.h"
#include "tools/png_folder.h"
#include "tools/standard_output.h"

#include <unistd.h>

#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <utility>

namespace {

constexpr const char* SHEET_FILE = "demo.png";
constexpr const char* EXPLANATION_FILE = "demo.svg";

class Demo {
public:
    explicit Demo(const DemoOptions& options)
        : m_options(options),
          m_folder(options.folder),
          m_status(stderr, isatty(STDERR_FILENO) == 1) {}

    WriteResult Run();

private:
    WriteResult Choose();
    WriteResult Begin();
    WriteResult Capture();
    WriteResult WriteFiles();
    WriteResult Finish();
    WriteResult Print(const std::string& text);

    const StopSignals m_signals;
    const DemoOptions m_options;
    PngFolder m_folder;
    StatusLine m_status;
    std::optional<SceneInForce> m_scene;
    DemoSubject m_subject;
    std::string m_explanation; // SVG
    DemoFindings m_findings;
};

WriteResult Demo::Run() {
    for (const auto step : {&Demo::Choose, &Demo::Begin, &Demo::Capture}) {
        if (WriteResult failure = (this->*step)())
            return failure;
        if (m_signals.IsRaised()) {
            m_status.Tell("stopped before the pictures were complete; nothing is written");
            return std::nullopt;
        }
    }
    if (WriteResult failure = WriteFiles())
        return failure;
    return Finish();
}

WriteResult Demo::Choose() {
    const std::optional<std::string> reason = WhyScene(m_options);
    if (!reason)
        return ChooseOnDesktop(m_options, m_subject);
    if (m_options.excludedWindow)
        return WriteFailure{
            EXIT_CODE_FAILED,
            "there is no window " + std::to_string(*m_options.excludedWindow) + " to keep out. " + *reason};
    m_scene.emplace();
    m_subject = m_scene->Subject();
    m_subject.place = *reason + ". This is a built-in scene: two monitors and a few applications.";
    return std::nullopt;
}

/// Whatever may fail at once does so before anybody waits for pictures.
WriteResult Demo::Begin() {
    if (WriteResult failure = m_folder.Open())
        return failure;
    m_explanation = ExplanationSvg(Explain(m_subject.request));
    m_findings.screen = ScreenPicture(m_subject.monitors);
    m_findings.screenTally = TallyPixels(m_findings.screen.get());
    return Print(DemoText({m_subject.place}));
}

WriteResult Demo::Capture() {
    const DesktopLook look;
    for (const std::string& name : CaptureModeNames()) {
        if (m_signals.IsRaised())
            break;
        m_status.Show("capturing in mode " + name);
        DemoShot shot = TakeShot(m_subject.request, *CaptureModeOf(name), m_signals);
        const PixelTally tally = TallyPixels(shot.picture.get());
        m_findings.shots.push_back({std::move(shot), tally});
        m_status.Clear();
        if (const std::string problem = look.ProblemSince(); !problem.empty())
            return WriteFailure{EXIT_CODE_FAILED, problem};
    }
    return std::nullopt;
}

WriteResult Demo::WriteFiles() {
    const platform::CGImageRef sheet =
        DrawSheet(DemoPictures(m_findings), DemoLessons(m_subject, m_findings));
    if (WriteResult failure = m_folder.Write(SHEET_FILE, sheet))
        return failure;
    const std::string file = m_folder.PathOf(EXPLANATION_FILE);
    errno = 0;
    if (!platform::writeToFile({m_explanation.begin(), m_explanation.end()}, file.c_str(), true))
        return FailureFromErrno(file, errno);
    return std::nullopt;
}

WriteResult Demo::Finish() {
    std::string text = DemoText(DemoLessons(m_subject, m_findings));
    text += "\n" + DemoTable(m_subject, m_findings) + "\n";
    text += m_folder.PathOf(SHEET_FILE) + "  the screen beside the pictures that others see\n";
    text += m_folder.PathOf(EXPLANATION_FILE) + "  which windows are in the share, and why\n\n";
    text += "Next: screenshare list windows, screenshare capture --help\n";
    if (WriteResult failure = Print(text))
        return failure;
    const std::string problem = DemoProblem(m_subject, m_findings);
    return problem.empty() ? WriteResult() : WriteFailure{EXIT_CODE_FAILED, problem};
}

WriteResult Demo::Print(const std::string& text) {
    return PrintAnswer(text, m_signals);
}

} // namespace

WriteResult RunDemo(const DemoOptions& options) {
    return Demo(options).Run();
}
