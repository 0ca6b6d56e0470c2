// SPDX-License-Identifier: Apache-2.0
#include "tests/soak/soak_report.h"

#include "tests/soak/soak_machine.h"
#include "tests/soak/soak_markdown.h"
#include "tools/json_text.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <fstream>
#include <utility>

namespace {

constexpr double MEDIAN = 0.5;
constexpr double MOST = 0.95;
constexpr double NEARLY_ALL = 0.99;

std::string Text(double number, int digits = 0) {
    std::array<char, 40> text{};
    std::snprintf(text.data(), text.size(), "%.*f", digits, number);
    return text.data();
}

double Microseconds(std::chrono::nanoseconds time) {
    return std::chrono::duration<double, std::micro>(time).count();
}

double Milliseconds(std::chrono::nanoseconds time) {
    return std::chrono::duration<double, std::milli>(time).count();
}

// ---- Tables

std::string CountersTable(const SoakResults& results) {
    MarkdownTable table({"Counter", "First", "Last", "Rests at", "Peak", "Growth", "Allowed", ""});
    for (const SoakCounterResult& each : results.counters) {
        if (!each.samples.empty())
            table.AddRow({each.name, Text(each.samples.front()), Text(each.samples.back()),
                          Text(each.trend.level), Text(each.trend.peak), Text(each.trend.growth, 1),
                          Text(each.allowed), each.trend.grows ? "GROWS" : "level"});
    }
    return table.Text();
}

std::vector<std::string> JitterCells(const SoakHistogram& jitter) {
    return {Text(Milliseconds(jitter.Percentile(MEDIAN)), 1), Text(Milliseconds(jitter.Percentile(MOST)), 1),
            Text(Milliseconds(jitter.Percentile(NEARLY_ALL)), 1), Text(Milliseconds(jitter.Longest()), 1)};
}

std::string SharesTable(const SoakResults& results) {
    MarkdownTable table({"Share", "Mode at the end", "Frames", "A second", "Calm: p50 ms", "p95", "p99",
                         "max", "Lively: p50 ms", "p95", "p99", "max", "Errors"});
    for (const SoakShareResult& each : results.shares) {
        std::vector<std::string> cells{each.name, std::to_string(static_cast<int>(each.mode)),
                                       std::to_string(each.frames), Text(each.framesPerSecond, 1)};
        for (const SoakHistogram* const jitter : {each.calmJitter, each.livelyJitter}) {
            for (const std::string& cell : JitterCells(*jitter))
                cells.push_back(cell);
        }
        cells.push_back(std::to_string(each.errors));
        table.AddRow(std::move(cells));
    }
    return table.Text();
}

std::string CallsTable(const SoakResults& results) {
    MarkdownTable table({"Call", "Times", "p50 us", "p99 us", "max us", "Refused"});
    for (const auto& [name, call] : *results.calls)
        table.AddRow({name, std::to_string(call.latency.Count()),
                      Text(Microseconds(call.latency.Percentile(MEDIAN))),
                      Text(Microseconds(call.latency.Percentile(NEARLY_ALL))),
                      Text(Microseconds(call.latency.Longest())), std::to_string(call.refused)});
    return table.Text();
}

/// What one has to know of a run to compare it with another.
std::string Circumstances(const SoakResults& results) {
    const SoakOptions& options = results.options;
    return Today() + ", " + MachineKind() + "; seed " + std::to_string(options.seed) + ", " +
           Text(std::chrono::duration<double>(options.duration).count()) + " s, two monitors of " +
           std::to_string(options.width) + "x" + std::to_string(options.height) + ", " +
           std::to_string(options.framesPerSecond) + " frames a second; " + std::to_string(results.pictures) +
           " thumbnails, " + std::to_string(results.visits) + " visits, " + std::to_string(results.events) +
           " events of lists.\n";
}

std::string Verdict(const SoakResults& results) {
    std::string text;
    for (const SoakCounterResult& each : results.counters) {
        if (each.trend.grows)
            text += "GROWS: " + each.name + " by " + Text(each.trend.growth, 1) + " in the second half\n";
    }
    for (const std::string& line : results.leftOver)
        text += "LEFT OVER: " + line + "\n";
    if (!results.failure.empty())
        text += "REFUSED: " + results.failure + "\n";
    return text.empty() ? "level: nothing grows, and nothing is left over at the end\n" : text;
}

// ---- JSON

std::string CounterJson(const SoakCounterResult& counter) {
    std::string samples = "[";
    for (const double sample : counter.samples)
        samples += (samples.size() > 1 ? ", " : "") + Text(sample);
    return JsonObjectText()
        .String("name", counter.name)
        .Number("level", counter.trend.level)
        .Number("peak", counter.trend.peak)
        .Number("growth", counter.trend.growth)
        .Number("allowed", counter.allowed)
        .Bool("grows", counter.trend.grows)
        .Array("samples", samples + "]")
        .Text();
}

JsonObjectText JitterJson(const SoakHistogram& jitter) {
    JsonObjectText json;
    json.Number("p50", Milliseconds(jitter.Percentile(MEDIAN)))
        .Number("p95", Milliseconds(jitter.Percentile(MOST)))
        .Number("p99", Milliseconds(jitter.Percentile(NEARLY_ALL)))
        .Number("max", Milliseconds(jitter.Longest()));
    return json;
}

std::string ShareJson(const SoakShareResult& share) {
    return JsonObjectText()
        .String("name", share.name)
        .Number("mode", share.mode)
        .Number("frames", static_cast<double>(share.frames))
        .Number("frames_per_second", share.framesPerSecond)
        .Object("calm_jitter_ms", JitterJson(*share.calmJitter))
        .Object("lively_jitter_ms", JitterJson(*share.livelyJitter))
        .Number("errors", static_cast<double>(share.errors))
        .Text();
}

std::string CallJson(const std::string& name, const SoakCall& call) {
    return JsonObjectText()
        .String("name", name)
        .Number("times", static_cast<double>(call.latency.Count()))
        .Number("p50_us", Microseconds(call.latency.Percentile(MEDIAN)))
        .Number("p99_us", Microseconds(call.latency.Percentile(NEARLY_ALL)))
        .Number("max_us", Microseconds(call.latency.Longest()))
        .Number("refused", static_cast<double>(call.refused))
        .Text();
}

template <class Items, class Write>
std::string ArrayOf(const Items& items, Write write) {
    std::vector<std::string> texts;
    for (const auto& item : items)
        texts.push_back(write(item));
    return JsonArrayText(texts);
}

} // namespace

bool SoakResults::IsGood() const {
    const bool grows = std::any_of(counters.begin(), counters.end(),
                                   [](const SoakCounterResult& each) { return each.trend.grows; });
    return !grows && leftOver.empty() && failure.empty();
}

std::string ProgressLine(std::chrono::seconds passed, const SoakFigures& figures, std::uint64_t frames,
                         std::uint64_t pictures) {
    const auto figure = [&figures](const char* name) {
        const auto found = figures.find(name);
        return found != figures.end() ? found->second : 0;
    };
    double resources = 0;
    for (const auto& [name, value] : figures)
        resources += name.compare(0, 2, "X ") == 0 && name != "X pixmap KiB" ? value : 0;
    constexpr double KIB_PER_MIB = 1024;
    std::array<char, 240> text{};
    std::snprintf(text.data(), text.size(),
                  "%5lld s  heap %6.1f MiB  resident %6.1f MiB  descriptors %3.0f  threads %3.0f  "
                  "X resources %4.0f  server %6.1f MiB  frames %llu  thumbnails %llu\n",
                  static_cast<long long>(passed.count()), figure("heap KiB") / KIB_PER_MIB,
                  figure("resident KiB") / KIB_PER_MIB, figure("descriptors"), figure("threads"), resources,
                  figure("server KiB") / KIB_PER_MIB, static_cast<unsigned long long>(frames),
                  static_cast<unsigned long long>(pictures));
    return text.data();
}

std::string ReportText(const SoakResults& results) {
    return "\n" + Circumstances(results) + "\n" + CountersTable(results) + "\n" + SharesTable(results) +
           "\n" + CallsTable(results) + "\n" + Verdict(results);
}

bool WriteReport(const SoakResults& results, const std::string& file) {
    std::vector<std::string> calls;
    for (const auto& [name, call] : *results.calls)
        calls.push_back(CallJson(name, call));
    JsonObjectText all;
    all.String("date", Today())
        .String("machine", MachineKind())
        .Number("seed", results.options.seed)
        .Number("seconds", std::chrono::duration<double>(results.options.duration).count())
        .Number("sample_ms", static_cast<double>(results.options.interval.count()))
        .Bool("good", results.IsGood())
        .Array("left_over", ArrayOf(results.leftOver, JsonStringText))
        .String("refused", results.failure)
        .Number("thumbnails", static_cast<double>(results.pictures))
        .Number("visits", results.visits)
        .Number("list_events", static_cast<double>(results.events))
        .Array("counters", ArrayOf(results.counters, CounterJson))
        .Array("shares", ArrayOf(results.shares, ShareJson))
        .Array("calls", JsonArrayText(calls));
    std::ofstream stream(file);
    stream << all.Text() << "\n";
    return static_cast<bool>(stream.flush());
}
