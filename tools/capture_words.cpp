// SPDX-License-Identifier: Apache-2.0
#include "tools/capture_words.h"

#include "tools/capture_options.h"
#include "tools/json_text.h"

#include <array>
#include <cinttypes>
#include <cmath>
#include <cstdio>

namespace {

/// Bit 1 of the statistics' flags.
constexpr unsigned FELL_BACK = 2;

std::string WithNumber(const char* words, int number) {
    return std::string(words) + " (" + std::to_string(number) + ")";
}

std::string UnavailableWords(int reason) {
    switch (reason) {
        case SHARE_CAPTURE_NO_DATA:
            return "nothing to show just now: there is no picture yet";
        case SHARE_CAPTURE_DRAGGING:
            return "nothing to show just now: windows are being dragged";
        default:
            return WithNumber("nothing to show just now", reason);
    }
}

template <class... Values>
std::string Printed(const char* format, Values... values) {
    std::array<char, 256> text{};
    std::snprintf(text.data(), text.size(), format, values...);
    return text.data();
}

double PerSecond(std::int64_t count, double seconds) {
    return seconds > 0 ? static_cast<double>(count) / seconds : 0;
}

double Megabytes(std::uint64_t bytes) {
    return static_cast<double>(bytes) / 1e6;
}

} // namespace

std::string StatusWords(int status) {
    switch (status) {
        case SHARE_CAPTURE_ENGINE_STATUS_STARTED:
            return "started";
        case SHARE_CAPTURE_ENGINE_STATUS_STOPPED:
            return "stopped";
        case SHARE_CAPTURE_ENGINE_STATUS_PAUSED:
            return "paused";
        default:
            return WithNumber("status", status);
    }
}

std::string ErrorWords(int code) {
    switch (code) {
        case SHARE_CAPTURE_DISPLAY_GONE:
            return WithNumber("the captured monitor has gone", code);
        case SHARE_CAPTURE_NO_SHARED_APP:
            return WithNumber("no shared application is left", code);
        default:
            return WithNumber("error", code);
    }
}

std::string EventWords(int type, int value) {
    switch (type) {
        case SHARE_CAPTURE_EVENT_APPS_CROSS_MONITORS:
            return value != 0 ? "shared windows lie on several monitors"
                              : "shared windows no longer lie on several monitors";
        case SHARE_CAPTURE_EVENT_CONTENT_UNAVAILABLE:
            return UnavailableWords(value);
        default:
            return WithNumber("event", type) + ": " + std::to_string(value);
    }
}

std::string ProgressLine(const CaptureProgress& progress) {
    const SHARE_CAPTURE_STATISTIC& statistic = progress.statistic;
    // The engine measures over some seconds, and has nothing before the first of them are over.
    const int mean = static_cast<int>(std::lround(PerSecond(statistic.nTotalFrames, progress.seconds)));
    const int fps = statistic.nCaptureFps != 0 ? statistic.nCaptureFps : mean;
    return Printed("%d fps  %dx%d  delivered %d  duplicates %d  events %" PRId64, fps,
                   statistic.nCaptureWidth, statistic.nCaptureHeight, statistic.nTotalFrames,
                   statistic.nDuplicateFrames, progress.events);
}

std::string FinalStatistics(const CaptureProgress& progress, const std::string& target) {
    const SHARE_CAPTURE_STATISTIC& statistic = progress.statistic;
    std::string text = Printed("  delivered   %d frames in %.1f s, %.1f a second\n", statistic.nTotalFrames,
                               progress.seconds, PerSecond(statistic.nTotalFrames, progress.seconds));
    text += Printed("  duplicates  %d\n", statistic.nDuplicateFrames);
    text += Printed("  last size   %dx%d\n", statistic.nCaptureWidth, statistic.nCaptureHeight);
    text += Printed("  mean times  capture %u ms, delivery %d ms, between frames %d ms\n",
                    statistic.m_nMsAverageCaptureCapabilityTime, statistic.m_nMsAverageDeliverCapabilityTime,
                    statistic.m_nMsAverageCaptureTime);
    text += Printed("  events      %" PRId64 "\n", progress.events);
    text += "  mode        " + CaptureModeName(statistic.eCaptureMode) +
            ((statistic.nFlags & FELL_BACK) != 0 ? ", after another one failed\n" : "\n");
    if (!target.empty())
        text += Printed("  written     %" PRId64 " frames, %.1f MB", progress.framesWritten,
                        Megabytes(progress.bytesWritten)) +
                ", " + target + "\n";
    return text;
}

std::string StatisticsJson(const CaptureProgress& progress, const std::string& target) {
    const SHARE_CAPTURE_STATISTIC& statistic = progress.statistic;
    JsonObjectText object;
    object.Number("delivered", statistic.nTotalFrames)
        .Number("seconds", progress.seconds)
        .Number("fps", PerSecond(statistic.nTotalFrames, progress.seconds))
        .Number("duplicates", statistic.nDuplicateFrames)
        .Number("width", statistic.nCaptureWidth)
        .Number("height", statistic.nCaptureHeight)
        .Number("capture_ms", statistic.m_nMsAverageCaptureCapabilityTime)
        .Number("delivery_ms", statistic.m_nMsAverageDeliverCapabilityTime)
        .Number("between_frames_ms", statistic.m_nMsAverageCaptureTime)
        .Number("events", static_cast<double>(progress.events))
        .String("mode", CaptureModeName(statistic.eCaptureMode))
        .Bool("fell_back", (statistic.nFlags & FELL_BACK) != 0);
    if (target.empty())
        return object.Null("written").Text();
    JsonObjectText written;
    written.Number("frames", static_cast<double>(progress.framesWritten))
        .Number("bytes", static_cast<double>(progress.bytesWritten))
        .String("target", target);
    return object.Object("written", written).Text();
}
