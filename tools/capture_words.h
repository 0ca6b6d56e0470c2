// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_capture_engine.h>

#include <cstdint>
#include <string>

/// What an engine tells in numbers, in words.

/// "started"
std::string StatusWords(int status);
/// "the captured monitor has gone (-203)"
std::string ErrorWords(int code);
/// "nothing to show just now: windows are being dragged"
std::string EventWords(int type, int value);

/// The state of a capture.
struct CaptureProgress {
    SHARE_CAPTURE_STATISTIC statistic{};
    double seconds = 0; ///< Since the start.
    std::int64_t events = 0;
    std::int64_t framesWritten = 0;
    std::uint64_t bytesWritten = 0;
};

/// One line, less than 80 characters for any numbers that come up.
std::string ProgressLine(const CaptureProgress& progress);
/// The same as FinalStatistics in one JSON object, without an end of line.
std::string StatisticsJson(const CaptureProgress& progress, const std::string& target);
/// Several lines. `target` is where frames went; empty for nowhere.
std::string FinalStatistics(const CaptureProgress& progress, const std::string& target);
