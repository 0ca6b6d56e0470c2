// SPDX-License-Identifier: Apache-2.0
#include "tools/share_arguments.h"

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace {

/// The main monitor is what stands in for a request that names nothing.
void TakeMonitor(const std::string& text, std::optional<unsigned>& monitor) {
    if (text != "main") {
        unsigned id = 0;
        if (!CLI::detail::lexical_cast(text, id))
            throw CLI::ValidationError("--monitor", "'" + text + "' is neither a number nor 'main'");
        monitor = id;
    }
}

/// Numbers, one or several with commas between them, are ids; anything else is a name, which may have commas.
void TakeIdsOrNames(const std::vector<std::string>& texts, std::vector<unsigned>& ids,
                    std::vector<std::string>& names) {
    for (const std::string& text : texts) {
        std::vector<unsigned> numbers;
        bool areNumbers = true;
        for (const std::string& part : CLI::detail::split(text, ',')) {
            const bool isNumber = !part.empty() && part.find_first_not_of("0123456789") == std::string::npos;
            areNumbers = areNumbers && isNumber && CLI::detail::lexical_cast(part, numbers.emplace_back());
        }
        if (!text.empty() && text.front() == '-')
            throw CLI::ValidationError("'" + text + "' is neither a number nor a name");
        if (areNumbers)
            ids.insert(ids.end(), numbers.begin(), numbers.end());
        else
            names.push_back(text);
    }
}

CLI::Option* AddIdsArgument(CLI::App& command, const std::string& name, std::vector<unsigned>& ids) {
    using Texts = std::vector<std::string>;
    return command.add_option_function<Texts>(name, [name, &ids](const Texts& texts) {
        for (const std::string& text : texts) {
            if (!CLI::detail::lexical_cast(text, ids.emplace_back()))
                throw CLI::ValidationError(name, "'" + text + "' is no number");
        }
    });
}

void AddPictureArguments(CLI::App& command, CaptureOptions& options) {
    command.add_option("--fps", options.fps, "Frames a second, 1 to 240; 30 unless told otherwise")
        ->type_name("N")
        ->check(CLI::Range(1U, 240U));
    command
        .add_option_function<std::string>(
            "--max",
            [&options](const std::string& text) {
                const std::optional<TVLSize> size = ParseSize(text);
                if (!size)
                    throw CLI::ValidationError("--max", "'" + text + "' is no size such as 1280x720");
                options.maxSize = *size;
            },
            "Make pictures no larger than this, such as 1280x720")
        ->type_name("WxH");
    command
        .add_option_function<std::string>(
            "--mode", [&options](const std::string& name) { options.mode = *CaptureModeOf(name); },
            "The way of capturing")
        ->type_name("MODE")
        ->check(CLI::IsMember(CaptureModeNames()));
    command.add_flag_callback(
        "--no-pointer", [&options] { options.showsPointer = false; }, "Leave the pointer out");
}

void AddLimitArguments(CLI::App& command, CaptureOptions& options) {
    constexpr std::int64_t MOST = 1'000'000'000;
    CLI::Option* const seconds = command.add_option("--seconds", options.seconds, "End after so long");
    CLI::Option* const frames = command.add_option("--frames", options.frames, "End after so many frames");
    seconds->type_name("N")->check(CLI::Range(std::int64_t{1}, MOST))->excludes(frames);
    frames->type_name("N")->check(CLI::Range(std::int64_t{1}, MOST));
}

CLI::Option* AddOutputArgument(CLI::App& command, CaptureOptions& options, CaptureForm form, const char* name,
                               const char* type, const char* description) {
    return command
        .add_option_function<std::string>(
            name,
            [&options, form](const std::string& target) {
                options.form = form;
                options.target = target;
            },
            description)
        ->type_name(type);
}

void AddOutputArguments(CLI::App& command, CaptureOptions& options) {
    CLI::Option* const png = AddOutputArgument(command, options, CaptureForm::Png, "--png", "DIR",
                                               "Write frame-000001.png and so on into this folder");
    CLI::Option* const y4m = AddOutputArgument(command, options, CaptureForm::Y4m, "--y4m", "FILE|-",
                                               "Write a YUV4MPEG2 stream; - is standard output");
    CLI::Option* const raw =
        AddOutputArgument(command, options, CaptureForm::Raw, "--raw", "FILE|-",
                          "Write bare BGRA pixels; their form is told on standard error");
    png->excludes(y4m)->excludes(raw);
    y4m->excludes(raw);
    command.add_flag("--json", options.tellsJson, "The statistics in the end as one JSON object");
}

} // namespace

ShareArguments AddShareArguments(CLI::App& command, ShareRequest& request) {
    CLI::Option* const monitor = command.add_option_function<std::string>(
        "--monitor", [&request](const std::string& text) { TakeMonitor(text, request.monitor); },
        "Share this monitor, or the 'main' one");
    using Texts = std::vector<std::string>;
    CLI::Option* const apps = command.add_option_function<Texts>(
        "--app", [&request](const Texts& texts) { TakeIdsOrNames(texts, request.apps, request.appNames); },
        "Share the windows of these applications, by process or by a name that only one has");
    CLI::Option* const windows = command.add_option_function<Texts>(
        "--window",
        [&request](const Texts& texts) { TakeIdsOrNames(texts, request.windows, request.windowTitles); },
        "Share these windows, by number or by a title that only one has");
    CLI::Option* const excludedApps = AddIdsArgument(command, "--exclude-app", request.excludedApps)
                                          ->description("Keep these applications out");
    CLI::Option* const excludedWindows = AddIdsArgument(command, "--exclude-window", request.excludedWindows)
                                             ->description("Keep these windows out");
    monitor->type_name("ID")->excludes(apps)->excludes(windows);
    apps->type_name("PID|NAME")->excludes(windows);
    windows->type_name("ID|TITLE");
    excludedApps->type_name("PID");
    excludedWindows->type_name("ID");
    for (CLI::Option* const option : {excludedApps, excludedWindows})
        option->delimiter(',');
    return {monitor, apps, windows};
}

void AddCaptureArguments(CLI::App& command, CaptureOptions& options) {
    AddShareArguments(command, options.request);
    AddPictureArguments(command, options);
    AddLimitArguments(command, options);
    AddOutputArguments(command, options);
}
