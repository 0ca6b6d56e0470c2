// SPDX-License-Identifier: Apache-2.0
#include <screenshare/share_trace.h>

#include "util/cm_trace.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace {

struct ReceivedLine {
    int level;
    std::string tag;
    std::string text;
};

extern "C" void Collect(void* context, int level, const char* tag, const char* text, int length) {
    const std::string line(text, static_cast<std::size_t>(length));
    static_cast<std::vector<ReceivedLine>*>(context)->push_back(
        {level, tag != nullptr ? tag : "(none)", line});
}

class ShareTrace : public testing::Test {
protected:
    ~ShareTrace() override {
        ShareSetTraceReceiver(nullptr, nullptr);
        ShareSetTraceThreshold(SHARE_TRACE_LEVEL_NONE);
    }
};

} // namespace

TEST_F(ShareTrace, IsSilentByDefault) {
    EXPECT_EQ(ShareGetTraceThreshold(), SHARE_TRACE_LEVEL_NONE);
    std::vector<ReceivedLine> lines;
    ShareSetTraceReceiver(Collect, &lines);
    CmTraceError("x");
    EXPECT_TRUE(lines.empty());
}

TEST_F(ShareTrace, HandsTheClientLinesUpToItsThreshold) {
    std::vector<ReceivedLine> lines;
    ShareSetTraceReceiver(Collect, &lines);
    ShareSetTraceThreshold(SHARE_TRACE_LEVEL_INFO);
    EXPECT_EQ(ShareGetTraceThreshold(), SHARE_TRACE_LEVEL_INFO);
    CmTraceInfo("told");
    CmTraceDebug("not told");
    CmReportFailedCheck("pThread != NULL", "src/x.cpp", 1);
    ASSERT_EQ(lines.size(), 2u);
    EXPECT_EQ(lines[0].level, SHARE_TRACE_LEVEL_INFO);
    EXPECT_EQ(lines[0].tag, "[ScreenShare],[Core]");
    EXPECT_EQ(lines[0].text, "[[ScreenShare],[Core]] INFO: told");
    EXPECT_EQ(lines[1].level, SHARE_TRACE_LEVEL_ERROR);
    EXPECT_EQ(lines[1].tag, "(none)");
    EXPECT_EQ(lines[1].text, "[UTIL] ERROR: src/x:1 Assert failed: pThread != NULL[src/x:1]");
}

TEST_F(ShareTrace, HandsNothingToAReceiverThatWasTakenAway) {
    std::vector<ReceivedLine> first;
    std::vector<ReceivedLine> second;
    ShareSetTraceThreshold(SHARE_TRACE_LEVEL_DETAIL);
    ShareSetTraceReceiver(Collect, &first);
    CmTraceDetail("1");
    ShareSetTraceReceiver(Collect, &second);
    CmTraceDetail("2");
    ShareSetTraceReceiver(nullptr, nullptr);
    CmTraceDetail("3");
    ASSERT_EQ(first.size(), 1u);
    EXPECT_EQ(first[0].text, "[[ScreenShare],[Core]] DETAIL: 1");
    ASSERT_EQ(second.size(), 1u);
    EXPECT_EQ(second[0].text, "[[ScreenShare],[Core]] DETAIL: 2");
}
