// SPDX-License-Identifier: Apache-2.0
#include "tools/explain_command.h"

#include "tools/explanation_svg.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <memory>

namespace {

struct CloseFile {
    void operator()(std::FILE* file) const { std::fclose(file); }
};

std::string WriteProblem(const std::string& file) {
    return "cannot write " + file + ": " + std::strerror(errno);
}

/// Empty when all of it is written.
std::string WriteFile(const std::string& file, const std::string& text) {
    errno = 0;
    std::unique_ptr<std::FILE, CloseFile> open(std::fopen(file.c_str(), "we"));
    if (!open)
        return WriteProblem(file);
    // What is only buffered counts when it has been taken.
    if (std::fwrite(text.data(), 1, text.size(), open.get()) != text.size() || std::fflush(open.get()) != 0)
        return WriteProblem(file);
    return std::fclose(open.release()) == 0 ? "" : WriteProblem(file);
}

} // namespace

std::string ExplainInto(const std::string& file, ShareRequest request) {
    if (std::string problem = CompleteRequest(request); !problem.empty())
        return problem;
    return WriteFile(file, ExplanationSvg(Explain(request)));
}
