// SPDX-License-Identifier: Apache-2.0
#include "tests/support/trace_log.h"
#include "tests/x11/x11_fixture.h"

#include <string>

/// What is traced of a real desktop may go to strangers.

namespace {

const std::string TITLE = "Notice of termination - Jane Roe";

class X11Trace : public X11Test {};

} // namespace

TEST_F(X11Trace, HoldsNoTitleOfAWindowThatIsListedAndShown) {
    const CTraceLog trace;
    if (!Begin())
        return;
    const platform::CGWindowID window = Add("window", "20 20 60 40 00ff00");
    ASSERT_TRUE(Application().SetProperty("window", "_NET_WM_NAME", "UTF8_STRING", 8, TITLE));
    ASSERT_TRUE(ComesTrue([&] { return Listed(window).title == TITLE; }));
    EXPECT_NE(TakeWhenShown(window, GREEN), nullptr);
    EXPECT_TRUE(trace.Contains("[X11Worker::BeginSession]>>connected")) << "nothing was traced";
    for (const std::string& line : trace.Lines())
        EXPECT_EQ(line.find("termination"), std::string::npos) << line;
}
