// SPDX-License-Identifier: Apache-2.0
#include "commands.h"

#include "options.h"

#include <cstdio>
#include <sstream>

namespace {

constexpr const char* commandHelp =
    "commands: fps N, max WxH, pause, resume, force, dup on|off, stats, stop, help\n";

// An engine that runs posts what touches the capturer to its worker: "ok" then means "will be done".
void PrintResult(const std::string& line, int result) {
    if (result == SHARE_RESULT_OK) {
        std::printf("%s: ok\n", line.c_str());
    } else {
        std::printf("%s: refused with %d\n", line.c_str(), result);
    }
}

int SetSwitch(IShareCaptureEngine& engine, SHARE_CAPTURE_ENGINE_CONFIG selector, bool on) {
    return engine.Config(selector, &on, sizeof(on));
}

// Refused like anything else that isn't understood when the argument makes no sense.
bool RunWithArgument(IShareCaptureEngine& engine, const std::string& line, const std::string& name,
                     const std::string& argument) {
    int number = 0;
    if (name == "fps" && ParseNumber(argument, 1, 240, number)) {
        PrintResult(line, engine.SetCaptureFps(static_cast<unsigned>(number)));
        return true;
    }
    if (name == "dup" && (argument == "on" || argument == "off")) {
        PrintResult(line, SetSwitch(engine, SHARE_CAPTURE_ENGINE_CONFIG_CHECK_DUP_FRAME, argument == "on"));
        return true;
    }
    const std::size_t cross = argument.find('x');
    int height = 0;
    if (name == "max" && cross != std::string::npos &&
        ParseNumber(argument.substr(0, cross), 1, 32767, number) &&
        ParseNumber(argument.substr(cross + 1), 1, 32767, height)) {
        PrintResult(line, engine.SetCaptureMaxFrameSize(static_cast<unsigned>(number),
                                                        static_cast<unsigned>(height)));
        return true;
    }
    return false;
}

bool RunWithoutArgument(IShareCaptureEngine& engine, const std::string& name) {
    if (name == "pause") {
        PrintResult(name, engine.Pause());
    } else if (name == "resume") {
        PrintResult(name, engine.Resume());
    } else if (name == "force") {
        PrintResult(name, SetSwitch(engine, SHARE_CAPTURE_ENGINE_CONFIG_FORCE_FRAME, true));
    } else if (name == "stats") {
        PrintStatistics(engine);
    } else {
        return false;
    }
    return true;
}

} // namespace

bool RunCommand(IShareCaptureEngine& engine, const std::string& line) {
    std::istringstream words(line);
    std::string name;
    std::string argument;
    std::string surplus;
    words >> name >> argument >> surplus;
    if (name.empty()) {
        return true;
    }
    if (name == "stop" && argument.empty()) {
        return false;
    }
    const bool done = surplus.empty() && (argument.empty() ? RunWithoutArgument(engine, name)
                                                           : RunWithArgument(engine, line, name, argument));
    if (!done) {
        std::fputs(commandHelp, stdout);
    }
    return true;
}

void PrintStatistics(IShareCaptureEngine& engine) {
    SHARE_CAPTURE_STATISTIC statistic{};
    engine.GetShareCaptureStatistic(statistic);
    std::printf(
        "statistics\n"
        "  frames delivered            %8d\n"
        "  time between frames (mean)  %8d ms\n"
        "  time of delivery (mean)     %8d ms\n"
        "  time of capture (mean)      %8u ms\n"
        "  width                       %8d\n"
        "  height                      %8d\n"
        "  frames a second (latest)    %8d\n"
        "  duplicates found            %8d\n"
        "  flags                       %#8x\n"
        "  capture mode                %8d\n",
        statistic.nTotalFrames, statistic.m_nMsAverageCaptureTime,
        statistic.m_nMsAverageDeliverCapabilityTime, statistic.m_nMsAverageCaptureCapabilityTime,
        statistic.nCaptureWidth, statistic.nCaptureHeight, statistic.nCaptureFps, statistic.nDuplicateFrames,
        statistic.nFlags, static_cast<int>(statistic.eCaptureMode));
}
