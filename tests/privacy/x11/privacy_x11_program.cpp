// SPDX-License-Identifier: Apache-2.0
#include "tests/privacy/x11/privacy_course.h"

#include <charconv>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <filesystem>
#include <stdexcept>
#include <string>
#include <system_error>

/// Real programs on a real X server, shared in each mode, and every frame looked at: ./dev privacy x11. Ends
/// with 0 when nothing was to be seen of who is kept out, with 1 when something was or when a share showed
/// nothing at all, with 2 when it couldn't run, and with 77 where a program that it needs is missing.

namespace {

using namespace std::chrono_literals;

struct Options {
    PrivacyCourseOptions course;
    std::string folder = "."; ///< For pictures of leaks.
};

unsigned NumberOf(const std::string& text) {
    unsigned number = 0;
    const char* const end = text.data() + text.size();
    const auto result = std::from_chars(text.data(), end, number);
    if (result.ec != std::errc() || result.ptr != end)
        throw std::invalid_argument("no number: " + text);
    return number;
}

/// --seconds=, --seed=, --folder=, --mode= for one alone, and --fault=forget.
Options ReadOptions(int count, const char* const* arguments) {
    constexpr unsigned LONGEST = 100000;
    Options options;
    for (int i = 1; i < count; ++i) {
        const std::string argument = arguments[i];
        const std::size_t equals = std::min(argument.find('='), argument.size() - 1);
        const std::string name = argument.substr(0, equals);
        const std::string value = argument.substr(equals + 1);
        if (name == "--seconds" && NumberOf(value) >= 1 && NumberOf(value) <= LONGEST)
            options.course.duration = std::chrono::seconds(NumberOf(value));
        else if (name == "--seed")
            options.course.seed = NumberOf(value);
        else if (name == "--folder" && !value.empty())
            options.folder = value;
        else if (name == "--mode" && value.size() < 3)
            options.course.modes = {static_cast<SCREEN_CAPTURER_TYPE>(NumberOf(value))};
        else if (argument == "--fault=forget")
            options.course.fault = PrivacyFault::Forget;
        else
            throw std::invalid_argument("no option: " + argument);
    }
    return options;
}

/// Nothing but what may be seen, shared as it is: no magenta, or magenta would prove nothing.
void CheckThatNobodyElseIsMagenta(PrivacyCourse& course, const Options& options) {
    constexpr long FRAMES = 15;
    PrivacyJournal journal(options.course.seed, options.folder);
    journal.SetPart("nothing but what may be seen");
    if (!course.OpenShown())
        throw std::runtime_error("what may be seen opens no windows");
    WatchedShare share(SHARE_CAPTURE_ENGINE_TYPE_DESKTOP, SCREEN_CAPTURER_TYPE_DEFAULT, PrivacyFault::None,
                       journal);
    share.Start();
    if (!ComesTrue([&] { return journal.Sum().alive >= FRAMES; }, 60s))
        throw std::runtime_error("what may be seen isn't shown");
    const PrivacyTally seen = journal.Sum();
    std::printf("Nothing but what may be seen: %ld frames, pixels with magenta: %ld\n", seen.frames,
                seen.forbidden);
    if (seen.forbidden != 0)
        throw std::runtime_error("there is magenta in what may be seen");
}

/// What makes a run worth nothing.
void CheckLife(PrivacyJournal& journal, const RealDesk& desk, const PrivacyCourseOptions& options) {
    constexpr long FEWEST = 5;
    for (const SCREEN_CAPTURER_TYPE mode : options.modes) {
        for (const SHARE_CAPTURE_ENGINE_TYPE kind : PRIVACY_KINDS) {
            const PrivacyTally tally = journal.Tally(kind, mode);
            const std::string name = std::string(NameOf(kind)) + " share in mode " + std::to_string(mode);
            if (tally.alive < FEWEST)
                journal.Fail("hardly anything is shown: " + name);
            if (tally.onScreen == 0)
                journal.Fail("never a secret on the screen: " + name);
            if (kind != SHARE_CAPTURE_ENGINE_TYPE_DESKTOP && tally.thumbnailsAlive == 0)
                journal.Fail("no thumbnail that shows anything: " + name);
        }
    }
    for (const RealKind kind : desk.Kinds()) {
        const std::string whose = std::string("secret ") + NameOf(kind);
        if (journal.MostOfSecret(whose) < 0.5)
            journal.Fail("isn't magenta: " + whose);
    }
}

int Run(const Options& options) {
    if (const auto missing = MissingProgram(RealDesk::Programs())) {
        std::printf("%s\n", missing->c_str());
        return 77;
    }
    std::filesystem::create_directories(options.folder);
    RealDesk desk;
    for (const std::string& missing : desk.Missing())
        std::printf("Not installed, so left out: %s\n", missing.c_str());
    // Read when the library is used for the first time.
    const CScratchFolder debugFolder;
    setenv("DISPLAY", desk.Server().Display().c_str(), 1);
    setenv("SCREENSHARE_PLATFORM", "x11", 1);
    setenv("SCREENSHARE_DEBUG_DIR", debugFolder.Path().c_str(), 1);
    ShareEngineInit();
    PrivacyJournal journal(options.course.seed, options.folder);
    {
        PrivacyCourse course(options.course, desk, journal);
        CheckThatNobodyElseIsMagenta(course, options);
        std::printf("Seed %u, %lld s\n", options.course.seed,
                    static_cast<long long>(options.course.duration.count()));
        course.Run();
    }
    ShareEngineUninit();
    CheckLife(journal, desk, options.course);
    std::fputs(journal.Table().c_str(), stdout);
    const bool isGood = journal.Sum().leaks == 0 && journal.Failures().empty();
    std::puts(isGood ? "Nothing was to be seen of who is kept out." : "FAILED");
    return isGood ? 0 : 1;
}

} // namespace

int main(int count, char** arguments) {
    try {
        return Run(ReadOptions(count, arguments));
    } catch (const std::exception& failure) {
        std::fprintf(stderr, "privacy: %s\n", failure.what());
        return 2;
    }
}
