// SPDX-License-Identifier: Apache-2.0
#include "tests/soak/soak_markdown.h"

#include <gtest/gtest.h>

TEST(MarkdownTable, HasBarsInLineAndDividesHeadingsFromTheRest) {
    MarkdownTable table({"call", "us"});
    table.AddRow({"Stop", "1234"});
    table.AddRow({"Start", ""});
    EXPECT_EQ(table.Text(),
              "| call  | us   |\n"
              "|-------|------|\n"
              "| Stop  | 1234 |\n"
              "| Start |      |\n");
}
