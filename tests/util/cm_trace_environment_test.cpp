// SPDX-License-Identifier: Apache-2.0
// What SCREENSHARE_TRACE does. It is read once in the life of a process, so each case here runs in a fresh
// one.
#include "tests/support/trace_log.h"
#include "util/cm_trace.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <string>

#include <unistd.h>

namespace {

const std::string EACH_LEVEL[] = {"[[ScreenShare],[Core]] ERROR: e[src/a:1]\n",
                                  "[[ScreenShare],[Core]] WARNING: w[src/a:2]\n",
                                  "[[ScreenShare],[Core]] INFO: i\n", "[[ScreenShare],[Core]] DEBUG: d\n",
                                  "[[ScreenShare],[Core]] DETAIL: t\n"};

std::string LinesUpTo(int threshold) {
    std::string lines;
    for (int level = 0; level <= threshold; ++level)
        lines += EACH_LEVEL[level];
    return lines;
}

void TraceEachLevel() {
    CmTraceError({"e", "src/a.cpp", 1});
    CmTraceWarning({"w", "src/a.cpp", 2});
    CmTraceInfo("i");
    CmTraceDebug("d");
    CmTraceDetail("t");
}

[[noreturn]] void TraceEachLevelAndExit(int expectedMask) {
    TraceEachLevel();
    std::exit(get_external_trace_mask() == expectedMask ? 0 : 1);
}

[[noreturn]] void TraceWithAClientToo(int clientThreshold, std::size_t expectedLines, int expectedMask) {
    std::size_t received;
    {
        CTraceLog log(clientThreshold);
        TraceEachLevel();
        received = log.Lines().size();
        if (get_external_trace_mask() != expectedMask)
            std::exit(2);
    }
    std::exit(received == expectedLines ? 0 : 1);
}

[[noreturn]] void ChangeTheVariableAfterTheFirstLook() {
    TraceEachLevel();
    setenv("SCREENSHARE_TRACE", "detail", 1);
    TraceEachLevelAndExit(CM_TRACE_ERROR);
}

[[noreturn]] void TraceALongLine() {
    const std::string text(3000, 'x');
    util_adapter_trace(CM_TRACE_ERROR, nullptr, text.c_str(), static_cast<int>(text.size()));
    std::exit(0);
}

[[noreturn]] void TraceWithoutStandardError() {
    close(STDERR_FILENO);
    errno = ENOTTY;
    CmTraceError("x");
    _exit(errno == ENOTTY ? 0 : 1);
}

[[noreturn]] void TraceIntoABrokenPipe() {
    int ends[2];
    if (pipe(ends) != 0 || dup2(ends[1], STDERR_FILENO) < 0)
        _exit(1);
    close(ends[0]);
    close(ends[1]);
    std::signal(SIGPIPE, SIG_DFL);
    CmTraceError("x");

    sigset_t pending;
    sigset_t blocked;
    sigpending(&pending);
    pthread_sigmask(SIG_BLOCK, nullptr, &blocked);
    _exit(sigismember(&pending, SIGPIPE) || sigismember(&blocked, SIGPIPE) ? 2 : 0);
}

class CmTraceEnvironment : public testing::Test {
protected:
    CmTraceEnvironment() { GTEST_FLAG_SET(death_test_style, "threadsafe"); }
    ~CmTraceEnvironment() override { unsetenv("SCREENSHARE_TRACE"); }

    static void Ask(const char* word) { setenv("SCREENSHARE_TRACE", word, 1); }
};

} // namespace

TEST_F(CmTraceEnvironment, WritesLinesUpToTheNamedLevelToStandardError) {
    const char* const words[] = {"error", "warning", "info", "debug", "detail"};
    for (int level = 0; level <= CM_TRACE_DETAIL; ++level) {
        SCOPED_TRACE(words[level]);
        Ask(words[level]);
        EXPECT_EXIT(TraceEachLevelAndExit(level), testing::ExitedWithCode(0), testing::Eq(LinesUpTo(level)));
    }
}

TEST_F(CmTraceEnvironment, CountsAnUnknownWordAsUnset) {
    for (const char* const word : {"", "Error", "errors", "2", "all"}) {
        SCOPED_TRACE(word);
        Ask(word);
        EXPECT_EXIT(TraceEachLevelAndExit(-1), testing::ExitedWithCode(0), testing::Eq(""));
    }
    unsetenv("SCREENSHARE_TRACE");
    EXPECT_EXIT(TraceEachLevelAndExit(-1), testing::ExitedWithCode(0), testing::Eq(""));
}

TEST_F(CmTraceEnvironment, IsReadOnce) {
    Ask("error");
    EXPECT_EXIT(ChangeTheVariableAfterTheFirstLook(), testing::ExitedWithCode(0),
                testing::Eq(LinesUpTo(CM_TRACE_ERROR) + LinesUpTo(CM_TRACE_ERROR)));
}

TEST_F(CmTraceEnvironment, KeepsItsThresholdApartFromTheClients) {
    Ask("warning");
    EXPECT_EXIT(TraceWithAClientToo(CM_TRACE_DEBUG, 4, CM_TRACE_DEBUG), testing::ExitedWithCode(0),
                testing::Eq(LinesUpTo(CM_TRACE_WARNING)));
    EXPECT_EXIT(TraceWithAClientToo(CM_TRACE_ERROR, 1, CM_TRACE_WARNING), testing::ExitedWithCode(0),
                testing::Eq(LinesUpTo(CM_TRACE_WARNING)));
    EXPECT_EXIT(TraceWithAClientToo(-1, 0, CM_TRACE_WARNING), testing::ExitedWithCode(0),
                testing::Eq(LinesUpTo(CM_TRACE_WARNING)));
}

TEST_F(CmTraceEnvironment, EndsEvenAnOverlongLineWithALineBreak) {
    Ask("error");
    EXPECT_EXIT(TraceALongLine(), testing::ExitedWithCode(0), testing::Eq(std::string(1023, 'x') + "\n"));
}

TEST_F(CmTraceEnvironment, BearsAClosedStandardError) {
    Ask("error");
    EXPECT_EXIT(TraceWithoutStandardError(), testing::ExitedWithCode(0), "");
}

TEST_F(CmTraceEnvironment, BearsAStandardErrorThatNobodyReads) {
    Ask("error");
    EXPECT_EXIT(TraceIntoABrokenPipe(), testing::ExitedWithCode(0), "");
}
