// SPDX-License-Identifier: Apache-2.0
#include "util/cm_trace.h"

#include "tests/support/trace_log.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <optional>
#include <string>
#include <vector>

namespace {

constexpr const char* HERE = "tests/util/cm_trace_test";

/// One line of each level, without places that move.
void TraceEachLevel() {
    CmTraceError({"e", "src/a.cpp", 1});
    CmTraceWarning({"w", "src/a.cpp", 2});
    CmTraceInfo("i");
    CmTraceDebug("d");
    CmTraceDetail("t");
}

/// Numbers of the occurrences, from 1, that a site lets through.
std::vector<int> DueOccurrences(CCmRepeatedTraceSite& site, int count) {
    std::vector<int> due;
    for (int occurrence = 1; occurrence <= count; ++occurrence) {
        if (site.Due())
            due.push_back(occurrence);
    }
    return due;
}

std::string PrintedPlace(const char* file) {
    char buffer[CCmTextFormator::BUFFER_SIZE];
    CCmTextFormator out(buffer, sizeof buffer);
    out << CCmSourcePlace{file, 7};
    return buffer;
}

} // namespace

TEST(CmTrace, IsSilentUntilAsked) {
    CTraceLog log(-1);
    EXPECT_EQ(get_external_trace_mask(), -1);
    EXPECT_FALSE(CmTraceOn(CM_TRACE_ERROR));
    TraceEachLevel();
    util_adapter_trace(CM_TRACE_ERROR, nullptr, "past the mask", 13);
    CmReportFailedCheck("pThread != NULL");
    EXPECT_TRUE(log.Lines().empty());
}

TEST(CmTrace, WritesTheLevelsUpToTheThreshold) {
    const std::vector<std::string> all = {"[[ScreenShare],[Core]] ERROR: e[src/a:1]",
                                          "[[ScreenShare],[Core]] WARNING: w[src/a:2]",
                                          "[[ScreenShare],[Core]] INFO: i", "[[ScreenShare],[Core]] DEBUG: d",
                                          "[[ScreenShare],[Core]] DETAIL: t"};
    for (int threshold = -2; threshold <= 6; ++threshold) {
        SCOPED_TRACE(threshold);
        CTraceLog log(threshold);
        TraceEachLevel();
        const int count = threshold < 0 ? 0 : std::min(threshold + 1, 5);
        EXPECT_EQ(log.Lines(), std::vector<std::string>(all.begin(), all.begin() + count));
    }
}

TEST(CmTrace, HandsLevelTagAndLengthOn) {
    CTraceLog log;
    TraceEachLevel();
    const std::vector<CTraceLog::Entry> entries = log.Entries();
    ASSERT_EQ(entries.size(), 5u);
    for (int level = CM_TRACE_ERROR; level <= CM_TRACE_DETAIL; ++level) {
        EXPECT_EQ(entries[static_cast<std::size_t>(level)].level, level);
        EXPECT_EQ(entries[static_cast<std::size_t>(level)].tag, "[ScreenShare],[Core]");
    }
}

TEST(CmTrace, PutsThePartsOfALineTogetherWithoutBlanks) {
    CTraceLog log;
    const bool on = true;
    CmTraceInfo("[CShareCaptureEngine::Start]", ",fps=", 30u, ",on=", on, ",scale=", 1.5f, ",id=", -1L);
    EXPECT_EQ(log.Lines().at(0),
              "[[ScreenShare],[Core]] INFO: [CShareCaptureEngine::Start],fps=30,on=1,scale=1.5,id=-1");
}

TEST(CmTrace, EndsErrorsAndWarningsWithThePlaceOfTheCall) {
    CTraceLog log;
    CmTraceError("failed,code=", -1);
    const int line = __LINE__ - 1;
    CmTraceWarning("odd");
    const std::string place = std::string("[") + HERE + ":";
    EXPECT_EQ(log.Lines().at(0),
              "[[ScreenShare],[Core]] ERROR: failed,code=-1" + place + std::to_string(line) + "]");
    EXPECT_EQ(log.Lines().at(1),
              "[[ScreenShare],[Core]] WARNING: odd" + place + std::to_string(line + 2) + "]");
    EXPECT_TRUE(IsLineAt(log.Lines().at(1), "[[ScreenShare],[Core]] WARNING: odd", HERE));
}

TEST(CmTrace, WritesRepeatedErrorsInTheFormOfUtilUnderANullTag) {
    CTraceLog log;
    CCmRepeatedTraceSite site;
    CmTraceRepeated(site, CM_TRACE_ERROR, {"Fail Capture,ret=", "src/share_capture_engine_pass.cpp", 123},
                    -302);
    CCmRepeatedTraceSite warnings;
    CmTraceRepeated(warnings, CM_TRACE_WARNING, "unavailable");
    const std::vector<CTraceLog::Entry> entries = log.Entries();
    ASSERT_EQ(entries.size(), 2u);
    EXPECT_EQ(entries[0].line,
              "[UTIL] ERROR: Fail Capture,ret=-302[ScreenShare],[Core][src/share_capture_engine_pass:123]");
    EXPECT_EQ(entries[0].tag, std::nullopt);
    EXPECT_TRUE(IsLineAt(entries[1].line, "[UTIL] WARNING: unavailable[ScreenShare],[Core]", HERE));
}

TEST(CmTrace, LetsTheFirstAndEachHundredthOccurrenceOfASiteThrough) {
    CCmRepeatedTraceSite site;
    EXPECT_EQ(DueOccurrences(site, 350), (std::vector<int>{1, 101, 201, 301}));
}

TEST(CmTrace, LetsEachTenthOccurrenceThroughWhereThePeriodIsTen) {
    CCmRepeatedTraceSite site(10);
    EXPECT_EQ(DueOccurrences(site, 40), (std::vector<int>{1, 11, 21, 31}));
}

TEST(CmTrace, CountsOccurrencesOfASiteWhileNobodyListens) {
    CCmRepeatedTraceSite site(10);
    CTraceLog log(-1);
    for (int i = 0; i < 10; ++i)
        CmTraceRepeated(site, CM_TRACE_ERROR, "x");
    CmSetTraceThreshold(CM_TRACE_ERROR);
    CmTraceRepeated(site, CM_TRACE_ERROR, "x");
    CmTraceRepeated(site, CM_TRACE_ERROR, "x");
    EXPECT_EQ(log.CountContaining("x"), 1u);
}

TEST(CmTrace, WritesTheFirstErrorInFullAndThinsOutTheNextOnesSiteBySite) {
    CTraceLog log;
    std::atomic<bool> firstError{true};
    CCmRepeatedTraceSite siteA;
    CCmRepeatedTraceSite siteB;
    for (int i = 1; i <= 202; ++i) {
        CmTraceRepeatedError(firstError, siteA, {"a", "src/p.cpp", 1}, i);
        CmTraceRepeatedError(firstError, siteB, {"b", "src/p.cpp", 2}, i);
    }
    EXPECT_FALSE(firstError.load());
    EXPECT_EQ(log.Lines(), (std::vector<std::string>{"[[ScreenShare],[Core]] ERROR: a1[src/p:1]",
                                                     "[UTIL] ERROR: b1[ScreenShare],[Core][src/p:2]",
                                                     "[UTIL] ERROR: a2[ScreenShare],[Core][src/p:1]",
                                                     "[UTIL] ERROR: b101[ScreenShare],[Core][src/p:2]",
                                                     "[UTIL] ERROR: a102[ScreenShare],[Core][src/p:1]",
                                                     "[UTIL] ERROR: b201[ScreenShare],[Core][src/p:2]",
                                                     "[UTIL] ERROR: a202[ScreenShare],[Core][src/p:1]"}));
}

TEST(CmTrace, WritesAFailedCheckAndCountsIt) {
    CTraceLog log;
    const unsigned before = cm_assertion_count();
    CmReportFailedCheck("pEventQueue != NULL", "src/x.cpp", 12);
    const std::vector<CTraceLog::Entry> entries = log.Entries();
    ASSERT_EQ(entries.size(), 1u);
    EXPECT_EQ(entries[0].line, "[UTIL] ERROR: src/x:12 Assert failed: pEventQueue != NULL[src/x:12]");
    EXPECT_EQ(entries[0].tag, std::nullopt);
    EXPECT_EQ(entries[0].level, CM_TRACE_ERROR);
    EXPECT_EQ(cm_assertion_count(), before + 1);
}

TEST(CmTrace, CountsAFailedCheckThatNobodyReads) {
    CTraceLog log(-1);
    const unsigned before = cm_assertion_count();
    CmReportFailedCheck("pThread != NULL");
    cm_assertion_report();
    EXPECT_EQ(cm_assertion_count(), before + 2);
}

TEST(CmTrace, CutsALineAt1023Bytes) {
    CTraceLog log;
    const std::string longText(2000, 'x');
    CmTraceInfo(longText.c_str());
    const std::string prefix = "[[ScreenShare],[Core]] INFO: ";
    EXPECT_EQ(log.Lines().at(0), prefix + longText.substr(0, 1023 - prefix.size()));
}

TEST(CmTrace, PrintsSourcePlacesFromTheProjectRootWithoutSuffix) {
    const struct {
        const char* file;
        const char* printed;
    } cases[] = {
        {"src/share_frame.cpp", "[src/share_frame:7]"},
        {"util/cm_trace.h", "[util/cm_trace:7]"},
        {"./src/x.cpp", "[src/x:7]"},
        {"././src/mac/x.cpp", "[src/mac/x:7]"},
        {"tests/src/x_test.cpp", "[tests/src/x_test:7]"},
        {"/home/me/screenshare/src/mac/x.cpp", "[src/mac/x:7]"},
        {"/home/me/src/screenshare/src/mac/avfoundation/x.cpp", "[src/mac/avfoundation/x:7]"},
        {"/usr/src/screenshare/util/x.cpp", "[util/x:7]"},
        {"/build/tools/src/screenshare/platform/x11/x.cpp", "[platform/x11/x:7]"},
        {"/p/json/json.cpp", "[json/json:7]"},
        {"/p/tools/x.cpp", "[tools/x:7]"},
        {"/p/examples/external_capturer/main.cpp", "[examples/external_capturer/main:7]"},
        {"/p/tests/src/mac/x_test.cpp", "[tests/src/mac/x_test:7]"},
        {"/p/tests/privacy/x.cpp", "[tests/privacy/x:7]"},
        {"../src/x.cpp", "[src/x:7]"},
        {"../../p.q/src/x.cpp", "[src/x:7]"},
        {"/elsewhere/x.cpp", "[x:7]"},
        {"x.cpp", "[x:7]"},
        {"src/x.tab.cpp", "[src/x.tab:7]"},
        {"src.d/x", "[src.d/x:7]"},
        {"src/.x", "[src/.x:7]"},
        {"", "[:7]"},
        {nullptr, "[:7]"},
    };
    for (const auto& [file, printed] : cases)
        EXPECT_EQ(PrintedPlace(file), printed) << (file != nullptr ? file : "null");
}

TEST(CmTrace, DropsALineThatIsNone) {
    CTraceLog log;
    util_adapter_trace(CM_TRACE_ERROR, nullptr, nullptr, 0);
    util_adapter_trace(CM_TRACE_ERROR, nullptr, "text", -1);
    util_adapter_trace(-1, nullptr, "text", 4);
    EXPECT_TRUE(log.Lines().empty());
}

TEST(CmTrace, GivesTheThresholdThatTheClientSet) {
    const int before = CmGetTraceThreshold();
    EXPECT_EQ(before, -1);
    CmSetTraceThreshold(CM_TRACE_DEBUG);
    EXPECT_EQ(CmGetTraceThreshold(), CM_TRACE_DEBUG);
    EXPECT_EQ(get_external_trace_mask(), CM_TRACE_DEBUG);
    CmSetTraceThreshold(before);
    EXPECT_EQ(get_external_trace_mask(), -1);
}

TEST(TraceLog, TakesPlacedLinesApart) {
    const std::optional<PlacedLine> placed = SplitSourcePlace("[T] ERROR: a[b:1][src/x:23]");
    ASSERT_TRUE(placed.has_value());
    EXPECT_EQ(placed->text, "[T] ERROR: a[b:1]");
    EXPECT_EQ(placed->path, "src/x");
    EXPECT_EQ(placed->line, 23);
    for (const char* const line : {"", "]", "[T] x", "[x:]", "[:1]", "[x:1", "[x:1a]", "x:1]"})
        EXPECT_EQ(WithoutSourcePlace(line), line);
    EXPECT_FALSE(IsLineAt("a[src/x:1]", "a", "src/y"));
    EXPECT_FALSE(IsLineAt("a[src/x:1]", "b", "src/x"));
    EXPECT_TRUE(IsLineAt("a[src/x:1]", "a", "src/x"));
}

TEST(TraceLog, RestoresTheThresholdAndLeavesNoReceiver) {
    CmSetTraceThreshold(CM_TRACE_WARNING);
    {
        CTraceLog log(CM_TRACE_DEBUG);
        EXPECT_EQ(CmGetTraceThreshold(), CM_TRACE_DEBUG);
        CmTraceInfo("once");
        EXPECT_TRUE(log.WaitUntilContains("once"));
        EXPECT_FALSE(log.WaitUntilContains("twice", 1, std::chrono::seconds(0)));
        EXPECT_EQ(log.CountContaining("on"), 1u);
        log.Clear();
        EXPECT_FALSE(log.Contains("once"));
    }
    EXPECT_EQ(CmGetTraceThreshold(), CM_TRACE_WARNING);
    CmSetTraceThreshold(-1);
}
