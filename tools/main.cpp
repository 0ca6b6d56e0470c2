// SPDX-License-Identifier: Apache-2.0

#include "platform/window_server.h"
#include "tools/explain_command.h"
#include "tools/list_command.h"

#include <screenshare/share_engine.h>

#include <CLI/CLI.hpp>

#include <cstdio>
#include <cstdlib>
#include <exception>
#include <functional>
#include <string>

namespace {

constexpr int DONE = 0;
constexpr int FAILED = 1;
constexpr int MISUSED = 2;

constexpr const char* DESCRIPTION = "Looks at what a screen share would show.";
constexpr const char* FOOTER =
    "Exit code: 0, 1 when something fails, 2 for a command line that makes no sense.\n"
    "SCREENSHARE_TRACE=info shows what the library does meanwhile.";
constexpr const char* EXPLAIN_DESCRIPTION =
    "Draw what a share would show, and why; of the main monitor unless told otherwise";

/// The library in use from here to the end of the scope.
class LibraryInUse {
public:
    LibraryInUse() { ShareEngineInit(); }
    ~LibraryInUse() { ShareEngineUninit(); }
    LibraryInUse(const LibraryInUse&) = delete;
    LibraryInUse& operator=(const LibraryInUse&) = delete;
};

int Fail(const std::string& problem) {
    std::fprintf(stderr, "screenshare: %s\n", problem.c_str());
    return FAILED;
}

int Print(const std::string& text) {
    const bool isWhole =
        std::fwrite(text.data(), 1, text.size(), stdout) == text.size() && std::fflush(stdout) == 0;
    return isWhole ? DONE : Fail("cannot write to standard output");
}

bool HasDesktop() {
    return std::string(platform::CurrentWindowServer()->Name()) != "none";
}

struct CommandLine {
    std::string platform;
    bool json = false;
    ShareRequest request;
    std::string file;
    std::function<int()> run; ///< What the chosen command does.
};

void AddListCommands(CLI::App& app, CommandLine& line) {
    CLI::App& list = *app.add_subcommand("list", "List what there is to share");
    list.require_subcommand(1);
    const auto add = [&](const char* name, const char* description, std::string (*text)(ListForm)) {
        CLI::App& command = *list.add_subcommand(name, description);
        command.add_flag("--json", line.json, "One JSON array instead of a table");
        command.callback([&line, text] {
            line.run = [&line, text] { return Print(text(line.json ? ListForm::Json : ListForm::Table)); };
        });
    };
    add("monitors", "The monitors, the main one first", MonitorListText);
    add("windows", "The windows on the screen, the front one first", WindowListText);
}

void AddShareOptions(CLI::App& command, ShareRequest& request) {
    CLI::Option* const monitor = command.add_option("--monitor", request.monitor, "Share this monitor");
    CLI::Option* const apps =
        command.add_option("--app", request.apps, "Share the windows of these applications");
    CLI::Option* const windows = command.add_option("--window", request.windows, "Share these windows");
    CLI::Option* const excludedApps =
        command.add_option("--exclude-app", request.excludedApps, "Keep these applications out");
    CLI::Option* const excludedWindows =
        command.add_option("--exclude-window", request.excludedWindows, "Keep these windows out");
    CLI::Option* const menuBars =
        command.add_flag("--exclude-menu-bar", request.excludesMenuBars,
                         "Keep menu bars out of a share of applications or windows");
    monitor->type_name("ID")->excludes(apps)->excludes(windows)->excludes(menuBars);
    apps->type_name("PID")->excludes(windows);
    windows->type_name("ID");
    excludedApps->type_name("PID");
    excludedWindows->type_name("ID");
    for (CLI::Option* const option : {apps, windows, excludedApps, excludedWindows})
        option->delimiter(',');
}

void AddExplainCommand(CLI::App& app, CommandLine& line) {
    CLI::App& command = *app.add_subcommand("explain", EXPLAIN_DESCRIPTION);
    AddShareOptions(command, line.request);
    command.add_option("FILE.svg", line.file, "The picture to write; replaced if it is there")
        ->required()
        ->type_name("");
    command.callback([&line] {
        line.run = [&line] {
            const std::string problem = ExplainInto(line.file, line.request);
            return problem.empty() ? DONE : Fail(problem);
        };
    });
}

void AddCommands(CLI::App& app, CommandLine& line) {
    app.require_subcommand(1);
    app.fallthrough();
    app.footer(FOOTER);
    app.add_option("--platform", line.platform, "The window server, like SCREENSHARE_PLATFORM")
        ->check(CLI::IsMember({"auto", "x11", "simulated", "none"}));
    AddListCommands(app, line);
    AddExplainCommand(app, line);
}

int Run(const CommandLine& line) {
    if (!line.platform.empty())
        setenv("SCREENSHARE_PLATFORM", line.platform.c_str(), 1);
    const LibraryInUse library;
    if (!HasDesktop())
        return Fail("there is no desktop to look at; --platform simulated shows an invented one");
    return line.run();
}

int Main(int argc, char** argv) {
    CommandLine line;
    CLI::App app(DESCRIPTION, "screenshare");
    AddCommands(app, line);
    try {
        app.parse(argc, argv);
    } catch (const CLI::ParseError& error) {
        // Help is an answer, too.
        return app.exit(error) == 0 ? DONE : MISUSED;
    }
    return Run(line);
}

} // namespace

int main(int argc, char** argv) {
    try {
        return Main(argc, argv);
    } catch (const std::exception& error) {
        return Fail(error.what());
    }
}
