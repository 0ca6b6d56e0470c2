// SPDX-License-Identifier: Apache-2.0
#include "tools/json_text.h"
#include "tools/svg_writer.h"
#include "tools/text_table.h"

#include <gtest/gtest.h>

#include <limits>
#include <string>

TEST(JsonText, EscapesWhatTitlesMayHold) {
    EXPECT_EQ(JsonStringText("a\"b\\c\n\x01 ö"), "\"a\\\"b\\\\c\\u000a\\u0001 ö\"");
}

TEST(JsonText, WritesMembersInTheirOrder) {
    EXPECT_EQ(JsonObjectText().Number("id", 4294967295.0).String("name", "x").Bool("main", true).Text(),
              "{\"id\": 4294967295, \"name\": \"x\", \"main\": true}");
}

TEST(JsonText, WritesNullForWhatIsNoNumber) {
    EXPECT_EQ(JsonObjectText().Number("x", std::numeric_limits<double>::infinity()).Text(), "{\"x\": null}");
}

TEST(JsonText, JoinsMembersOfTwoObjects) {
    const JsonObjectText some = JsonObjectText().Number("a", 1);
    EXPECT_EQ(JsonObjectText().Number("b", 2).MembersOf(some).Text(), "{\"b\": 2, \"a\": 1}");
    EXPECT_EQ(JsonObjectText().MembersOf(some).MembersOf({}).Text(), "{\"a\": 1}");
}

TEST(JsonText, WritesAnArrayWithoutElements) {
    EXPECT_EQ(JsonArrayText({}), "[]\n");
    EXPECT_EQ(JsonArrayText({"1", "2"}), "[\n  1,\n  2\n]\n");
}

TEST(SvgWriter, EscapesTextAndDropsWhatXmlCannotHold) {
    SvgWriter svg(10, 10);
    svg.AddText(1, 2, "<a & \"b\">\x01\xEF\xBF\xBF!", {});
    EXPECT_NE(svg.Finish().find(">&lt;a &amp; &quot;b&quot;&gt;  !</text>"), std::string::npos);
}

TEST(SvgWriter, WritesNumbersWithOneDigitAtMost) {
    SvgWriter svg(10, 10);
    svg.AddRect({0.26, -0.01, 3, 100.04}, {.fill = "#000000"});
    EXPECT_NE(svg.Finish().find("x=\"0.3\" y=\"0\" width=\"3\" height=\"100\""), std::string::npos);
}

TEST(ShortenText, CutsAtCharactersAndNotInThem) {
    EXPECT_EQ(ShortenText("äöü", 3), "äöü");
    EXPECT_EQ(ShortenText("äöüß", 3), "äö…");
    EXPECT_EQ(ShortenText("ab", 1), "…");
    EXPECT_EQ(ShortenText("ab", 0), "");
    EXPECT_EQ(ShortenText("ab", -3), "");
    EXPECT_EQ(ShortenText("", 0), "");
}

TEST(TextTable, AlignsColumnsByCharactersAndShowsNoControlCharacters) {
    TextTable table({"A", "B", "C"});
    table.AddRow({"ä", "", "x\x1b[0m"});
    table.AddRow({"long", "2", "y"});
    EXPECT_EQ(table.Text(), "A     B  C\nä     -  x [0m\nlong  2  y\n");
}

TEST(TextColumns, PushesTheOthersAsideForACellThatIsTooWide) {
    TextColumns columns;
    columns.Widen({"A", "BB", "C"});
    EXPECT_EQ(columns.Line({"1", "long one", "x"}), "1  long one  x\n");
    EXPECT_EQ(columns.Line({"1", "", "x"}), "1  -   x\n");
    EXPECT_EQ(columns.Line({"1", "2", "x", "more", "than there is"}), "1  2   x  more  than there is\n");
}
