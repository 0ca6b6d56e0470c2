// SPDX-License-Identifier: Apache-2.0
#include "tests/support/engine_bench.h"

#include <unistd.h>

#include <filesystem>
#include <thread>

#include <pthread.h>

namespace {

std::string Line(const std::string& word, const std::string& message) {
    return "[[ScreenShare],[Core]] " + word + ": " + message;
}

std::string ThinnedLine(const std::string& word, const std::string& message) {
    return "[UTIL] " + word + ": " + message + "[ScreenShare],[Core]";
}

} // namespace

std::shared_ptr<IShareCapturer> Borrow(IShareCapturer& capturer) {
    return {std::shared_ptr<void>(), &capturer};
}

std::string Detail(const std::string& message) {
    return Line("DETAIL", message);
}

std::string Debug(const std::string& message) {
    return Line("DEBUG", message);
}

std::string Info(const std::string& message) {
    return Line("INFO", message);
}

std::string Warning(const std::string& message) {
    return Line("WARNING", message);
}

std::string Error(const std::string& message) {
    return Line("ERROR", message);
}

std::string ThinnedWarning(const std::string& message) {
    return ThinnedLine("WARNING", message);
}

std::string ThinnedError(const std::string& message) {
    return ThinnedLine("ERROR", message);
}

std::vector<std::string> WithoutSourcePlaces(std::vector<std::string> lines) {
    for (std::string& line : lines)
        line = WithoutSourcePlace(line);
    return lines;
}

testing::AssertionResult AreAllAt(const std::vector<std::string>& lines, const std::string& text,
                                  const std::string& path) {
    for (const std::string& line : lines) {
        if (const testing::AssertionResult result = IsLineAt(line, text, path); !result)
            return result;
    }
    return testing::AssertionSuccess();
}

bool IsOnlyTestOfProcess() {
    return testing::UnitTest::GetInstance()->test_to_run_count() == 1;
}

std::ptrdiff_t CountThreadsAtRest() {
    pid_t id = 0;
    std::thread([&id] { id = gettid(); }).join();
    // What has just been joined may stay in the system's list for a moment.
    while (std::filesystem::exists("/proc/self/task/" + std::to_string(id)))
        std::this_thread::yield();
    return CountThreadsOfProcess();
}
