// SPDX-License-Identifier: Apache-2.0
//
// How a client builds its source picker: lists what could be shared, with a picture of each, and follows what
// changes. Read picker.cpp for the order of things; sources.h and thumbnails.h stand between it and the
// threads of the library, and mailbox.h is the way from those to the main one.

#include "picker.h"

#include <fcntl.h>
#include <sys/signalfd.h>
#include <unistd.h>

#include <charconv>
#include <csignal>
#include <cstdio>
#include <exception>
#include <filesystem>
#include <string>

namespace {

const char* const usageText =
    "picker - lists what could be shared and shows what changes\n"
    "\n"
    "  --seconds N  end after N seconds\n"
    "  --out DIR    write thumbnails there, as PNG files; those of the same name are replaced\n"
    "  --help       this text\n"
    "\n"
    "Ends by the limit, by Ctrl-C, or when nobody reads its output any more.\n"
    "Exit code: 0, 1 when something fails, 2 for a command line that makes no sense.\n";

struct Options {
    int seconds = 0; // no limit
    std::string folder;
};

int Fail(const std::string& problem, int exitCode) {
    std::fprintf(stderr, "picker: %s\n", problem.c_str());
    return exitCode;
}

bool ParseSeconds(const std::string& text, int& seconds) {
    const char* const end = text.data() + text.size();
    const auto [rest, error] = std::from_chars(text.data(), end, seconds);
    return error == std::errc() && rest == end && seconds > 0 && seconds <= 1000000;
}

bool ParseOption(const std::string& name, const std::string& value, Options& options) {
    if (name == "--out")
        options.folder = value;
    return name == "--out" ? !value.empty() : name == "--seconds" && ParseSeconds(value, options.seconds);
}

// Started without one, the next descriptor opened would take its number, and get what is printed.
bool HasStandardStreams() {
    return fcntl(STDIN_FILENO, F_GETFD) >= 0 && fcntl(STDOUT_FILENO, F_GETFD) >= 0 &&
           fcntl(STDERR_FILENO, F_GETFD) >= 0;
}

// Blocked for this thread and all that the library starts later: they come to a descriptor.
int OpenSignals() {
    std::signal(SIGPIPE, SIG_IGN);
    sigset_t signals;
    sigemptyset(&signals);
    sigaddset(&signals, SIGINT);
    sigaddset(&signals, SIGTERM);
    pthread_sigmask(SIG_BLOCK, &signals, nullptr);
    return signalfd(-1, &signals, SFD_CLOEXEC);
}

} // namespace

int main(int argc, char** argv) {
    Options options;
    for (int i = 1; i < argc; i += 2) {
        if (std::string(argv[i]) == "--help")
            return std::fputs(usageText, stdout) < 0 ? 1 : 0;
        if (!ParseOption(argv[i], i + 1 < argc ? argv[i + 1] : "", options))
            return Fail(std::string("no such option or no such value: ") + argv[i] + ", try --help", 2);
    }
    if (!HasStandardStreams())
        return Fail("standard input, output or error is closed", 1);
    try {
        const int signals = OpenSignals(); // before any thread of the library
        if (!options.folder.empty())
            std::filesystem::create_directories(options.folder);
        Picker picker(options.folder);
        picker.Run(signals, std::chrono::seconds(options.seconds));
    } catch (const std::exception& failure) {
        return Fail(failure.what(), 1);
    }
    return 0;
}
