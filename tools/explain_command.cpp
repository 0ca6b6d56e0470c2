// SPDX-License-Identifier: Apache-2.0
#include "tools/explain_command.h"

#include "tools/desktop_state.h"
#include "tools/explanation_json.h"
#include "tools/explanation_svg.h"
#include "tools/standard_output.h"

#include <utility>

namespace {

WriteResult NotExplained(std::string problem) {
    return WriteFailure{EXIT_CODE_FAILED, std::move(problem)};
}

WriteResult WriteWholeFile(const std::string& file, const std::string& text) {
    const StopFlag neverStopped;
    CaptureOutput output(neverStopped);
    if (WriteResult failure = output.Open(file))
        return failure;
    if (WriteResult failure = output.Write(text.data(), text.size()))
        return failure;
    return output.Close();
}

} // namespace

WriteResult ExplainInto(const std::string& file, ExplainForm form, ShareRequest request) {
    if (std::string problem = ProblemBeforeLook(); !problem.empty())
        return NotExplained(std::move(problem));
    const DesktopLook look;
    const std::string misfit = CompleteRequest(request);
    const Explanation explanation = misfit.empty() ? Explain(request) : Explanation();
    // What isn't there may only have gone with everything else.
    if (std::string problem = look.ProblemSince(); !problem.empty())
        return NotExplained(std::move(problem));
    if (!misfit.empty())
        return NotExplained(misfit);
    const std::string text =
        form == ExplainForm::Json ? ExplanationJson(explanation) : ExplanationSvg(explanation);
    return file.empty() || file == "-" ? PrintAnswer(text) : WriteWholeFile(file, text);
}
