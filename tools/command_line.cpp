// SPDX-License-Identifier: Apache-2.0
#include "tools/command_line.h"

#include "platform/utf8.h"
#include "tools/capture_command.h"
#include "tools/command_tree.h"
#include "tools/completion.h"
#include "tools/demo_command.h"
#include "tools/desktop_state.h"
#include "tools/doctor_command.h"
#include "tools/exit_code.h"
#include "tools/explain_command.h"
#include "tools/help_text.h"
#include "tools/list_watch.h"
#include "tools/manual.h"
#include "tools/share_arguments.h"
#include "tools/standard_output.h"
#include "tools/thumbnails_command.h"

#include <screenshare/share_engine.h>

#include <algorithm>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <functional>
#include <string>
#include <string_view>

namespace {

/// The library in use from here to the end of the scope.
class LibraryInUse {
public:
    LibraryInUse() { ShareEngineInit(); }
    ~LibraryInUse() { ShareEngineUninit(); }
    LibraryInUse(const LibraryInUse&) = delete;
    LibraryInUse& operator=(const LibraryInUse&) = delete;
};

enum class Needs {
    Nothing,
    Library,
    Desktop,
};

struct CommandLine {
    std::string platform;
    bool mentionsJson = false; ///< Known before the commands are.
    bool json = false;
    bool isWatched = false;
    ShareRequest request;
    std::string file;
    CaptureOptions capture;
    ThumbnailOptions thumbnails;
    DemoOptions demo;
    Needs needs = Needs::Desktop;
    std::function<int()> run; ///< What the chosen command does.
};

/// Problems tell what the command line said, which may be anything.
int Fail(const std::string& problem, ExitCode code = EXIT_CODE_FAILED) {
    std::fprintf(stderr, "screenshare: %s\n",
                 platform::WithoutControls(platform::MendedUtf8(problem)).c_str());
    return code;
}

int Ended(const WriteResult& result) {
    return result ? Fail(result->text, result->code) : EXIT_CODE_DONE;
}

CLI::App& AddCommand(CLI::App& app, const char* name) {
    CLI::App& command = *app.add_subcommand(name, TextOfCommand(name).summary);
    command.group("Commands");
    return command;
}

int RunList(const ListKind& list, ListForm form, bool isWatched) {
    return Ended(isWatched ? WatchList(list, form) : PrintList(list, form));
}

void AddListCommands(CLI::App& app, CommandLine& line) {
    CLI::App& list = AddCommand(app, "list");
    list.require_subcommand(1);
    const auto add = [&](const char* name, const char* description, const ListKind& (*kind)()) {
        CLI::App& command = *list.add_subcommand(name, description);
        command.add_flag("--json", line.json, "JSON instead of a table");
        command.add_flag("--watch", line.isWatched, "Go on and tell what changes, until Ctrl-C");
        command.callback([&line, kind] {
            line.run = [&line, kind] {
                return RunList(kind(), line.json ? ListForm::Json : ListForm::Table, line.isWatched);
            };
        });
    };
    add("apps", "The running applications that can be shared", ListOfApplications);
    add("windows", "The windows on the screen, the front one first", ListOfWindows);
    add("monitors", "The monitors, the main one first", ListOfMonitors);
}

void AddThumbnailsCommand(CLI::App& app, CommandLine& line) {
    CLI::App& command = AddCommand(app, "thumbnails");
    ThumbnailOptions& options = line.thumbnails;
    CLI::Option* const apps = command.add_flag_callback(
        "--apps", [&options] { options.windows = false; }, "Only those of applications");
    CLI::Option* const windows = command.add_flag_callback(
        "--windows", [&options] { options.apps = false; }, "Only those of windows");
    apps->excludes(windows);
    command.add_flag("--json", options.tellsJson, "A JSON object a line instead of a table");
    command.add_option("DIR", options.folder, "The folder to write them into; made if it isn't there")
        ->required();
    command.callback([&line] { line.run = [&line] { return Ended(RunThumbnails(line.thumbnails)); }; });
}

void AddExplainCommand(CLI::App& app, CommandLine& line) {
    CLI::App& command = AddCommand(app, "explain");
    const ShareArguments share = AddShareArguments(command, line.request);
    command
        .add_flag("--exclude-menu-bar", line.request.excludesMenuBars,
                  "Keep menu bars out of a share of applications or windows")
        ->excludes(share.monitor);
    command.add_flag("--json", line.json, "JSON instead of a picture");
    CLI::Option& file = *command.add_option(
        "FILE.svg", line.file,
        "The file to write; replaced if it is there. - is standard output, as is no file with --json");
    // One that is required is left to it by options that take many values, which would have it otherwise.
    file.required(!line.mentionsJson);
    command.callback([&line] {
        line.run = [&line] {
            return Ended(
                ExplainInto(line.file, line.json ? ExplainForm::Json : ExplainForm::Picture, line.request));
        };
    });
}

void AddCaptureCommand(CLI::App& app, CommandLine& line) {
    CLI::App& command = AddCommand(app, "capture");
    AddCaptureArguments(command, line.capture);
    command.callback([&line] { line.run = [&line] { return int{RunCapture(line.capture)}; }; });
}

int PrintDoctor(DoctorForm form) {
    const DoctorAnswer answer = RunDoctor(form);
    const int printed = Ended(PrintAnswer(answer.text));
    return printed == EXIT_CODE_DONE ? int{answer.code} : printed;
}

void AddDoctorCommand(CLI::App& app, CommandLine& line) {
    CLI::App& command = AddCommand(app, "doctor");
    command.add_flag("--json", line.json, "One JSON object instead of text");
    command.callback([&line] {
        line.needs = Needs::Library; // also tells why there is no desktop
        line.run = [&line] { return PrintDoctor(line.json ? DoctorForm::Json : DoctorForm::Text); };
    });
}

void AddDemoCommand(CLI::App& app, CommandLine& line) {
    CLI::App& command = AddCommand(app, "demo");
    DemoOptions& options = line.demo;
    command
        .add_option("--out", options.folder, "The folder for the two files, out/demo unless told otherwise")
        ->type_name("DIR");
    CLI::Option* const scene =
        command.add_flag("--scene", options.usesScene, "The built-in scene, also where there is a desktop");
    command
        .add_option("--exclude-window", options.excludedWindow, "Keep this window out, not the frontmost one")
        ->type_name("ID")
        ->excludes(scene);
    command.callback([&line] {
        line.needs = Needs::Library; // without a desktop it has a scene
        line.run = [&line] { return Ended(RunDemo(line.demo)); };
    });
}

/// For those who install the program; not among the commands that people are told of.
void AddManualCommands(CLI::App& app, CommandLine& line) {
    CLI::App& manual = *app.add_subcommand("manual", "Print what is installed beside the program");
    manual.group("")->require_subcommand(1);
    const auto add = [&](const char* name, const char* description,
                         std::string (*text)(const DescribedCommand&)) {
        CLI::App& command = *manual.add_subcommand(name, description);
        command.callback([&app, &line, text] {
            line.needs = Needs::Nothing;
            line.run = [&app, text] { return Ended(PrintAnswer(text(DescribeCommand(app)))); };
        });
    };
    add("man", "The manual page", ManualPage);
    add("bash", "Completion for bash", BashCompletion);
}

void AddCommands(CLI::App& app, CommandLine& line) {
    app.require_subcommand(1);
    app.fallthrough();
    app.formatter_fn([](const CLI::App* command, const std::string&, CLI::AppFormatMode) {
        return HelpText(DescribeCommand(*command));
    });
    app.set_help_flag("-h,--help", "Print help and end");
    app.set_version_flag("--version", "screenshare " SCREENSHARE_VERSION, "Print the version and end");
    app.add_option("--platform", line.platform, "The window server, like SCREENSHARE_PLATFORM")
        ->type_name("NAME")
        ->check(CLI::IsMember({"auto", "x11", "simulated", "none"}));
    AddListCommands(app, line);
    AddThumbnailsCommand(app, line);
    AddExplainCommand(app, line);
    AddCaptureCommand(app, line);
    AddDoctorCommand(app, line);
    AddDemoCommand(app, line);
    AddManualCommands(app, line);
    RefuseValuesOfFlags(app);
}

int Run(const CommandLine& line) {
    if (line.needs == Needs::Nothing)
        return line.run();
    if (!line.platform.empty())
        setenv("SCREENSHARE_PLATFORM", line.platform.c_str(), 1);
    const LibraryInUse library;
    if (line.needs == Needs::Desktop) {
        if (const std::string problem = ProblemOfNoDesktop(); !problem.empty())
            return Fail(problem);
    }
    return line.run();
}

int ParseAndRun(int argc, char** argv) {
    CommandLine line;
    line.mentionsJson =
        std::any_of(argv, argv + argc, [](const char* word) { return std::string_view(word) == "--json"; });
    CLI::App app(ProgramText().summary, ProgramText().name);
    AddCommands(app, line);
    try {
        app.parse(argc, argv);
    } catch (const CLI::CallForHelp&) {
        return Ended(PrintAnswer(app.help()));
    } catch (const CLI::CallForVersion& version) {
        return Ended(PrintAnswer(std::string(version.what()) + "\n"));
    } catch (const CLI::ParseError& error) {
        return Fail(MisuseText(app, error), EXIT_CODE_MISUSED);
    }
    return Run(line);
}

} // namespace

int RunCommandLine(int argc, char** argv) {
    // A closed pipe is told by write.
    std::signal(SIGPIPE, SIG_IGN);
    try {
        return ParseAndRun(argc, argv);
    } catch (const std::exception& error) {
        return Fail(error.what());
    }
}
