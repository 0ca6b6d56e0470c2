// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/soak/soak_controls.h"
#include "tests/soak/soak_meter.h"
#include "tests/soak/soak_options.h"
#include "tests/soak/soak_trend.h"

#include <chrono>
#include <cstdint>
#include <map>
#include <string>
#include <vector>

/// What a run has shown.

struct SoakCounterResult {
    std::string name;
    double allowed = 0;
    SoakTrend trend;
    std::vector<double> samples;
};

struct SoakShareResult {
    std::string name;
    SCREEN_CAPTURER_TYPE mode{}; ///< At the end: a share may have gone back to the default one.
    std::uint64_t errors = 0;
    std::uint64_t frames = 0;
    double framesPerSecond = 0;
    const SoakHistogram* calmJitter = nullptr;
    const SoakHistogram* livelyJitter = nullptr;
};

struct SoakResults {
    SoakOptions options;
    std::vector<SoakCounterResult> counters;
    std::vector<SoakShareResult> shares;
    const std::map<std::string, SoakCall>* calls = nullptr;
    std::uint64_t pictures = 0; ///< Thumbnails that came.
    std::uint64_t events = 0;   ///< Of lists.
    unsigned visits = 0;        ///< Of an application that comes and goes.
    std::string failure;        ///< What must not be refused and was.
    std::vector<std::string> leftOver;

    bool IsGood() const;
};

/// One line of a run that goes on.
std::string ProgressLine(std::chrono::seconds passed, const SoakFigures& figures, std::uint64_t frames,
                         std::uint64_t pictures);

/// Tables of Markdown, and at last what is wrong, a line each: "GROWS: ", "LEFT OVER: ", "REFUSED: ".
std::string ReportText(const SoakResults& results);

/// All of it, with every sample. False when it can't be written.
bool WriteReport(const SoakResults& results, const std::string& file);
