// SPDX-License-Identifier: Apache-2.0
#include "tools/completion.h"
#include "tools/help_text.h"
#include "tools/manual.h"

#include <gtest/gtest.h>

#include <set>
#include <string>

namespace {

/// A program of one command, which has texts that would disturb a manual page or a shell.
DescribedCommand SmallProgram() {
    DescribedCommand paint;
    paint.path = "screenshare paint";
    paint.summary = "Paint";
    paint.text.examples = {{"screenshare paint '.\\n' --to a-b", "it's a \\dot"}};
    paint.text.paragraphs = {".SH is no heading"};
    paint.options = {{{"-c", "--colour"}, "NAME", false, false, "The colour", {"red", "green", "blue"}},
                     {{"--into"}, "DIR", false, false, "Where to"}};
    paint.commonOptions = {{{"--platform"}, "NAME", false, false, "The server", {"x11"}}};
    DescribedCommand program;
    program.path = "screenshare";
    program.summary = "Does it";
    program.commands = {paint};
    return program;
}

bool HasPart(const std::string& text, const std::string& part) {
    return text.find(part) != std::string::npos;
}

} // namespace

TEST(WrapWords, BreaksBeforeTheWordThatDoesNotFit) {
    EXPECT_EQ(WrapWords("aa bb cc", 5, 2), "aa bb\n  cc");
    EXPECT_EQ(WrapWords("aa bb cc", 4, 2), "aa\n  bb\n  cc");
    EXPECT_EQ(WrapWords("aaaaaa b", 4, 1), "aaaaaa\n b");
    EXPECT_EQ(WrapWords("", 4, 1), "");
}

TEST(HelpText, TellsChoicesAndPutsALongHeadOnALineOfItsOwn) {
    DescribedCommand paint = SmallProgram().commands.front();
    EXPECT_TRUE(HasPart(HelpText(paint), "  -c, --colour NAME       The colour: red, green or blue\n"))
        << HelpText(paint);
    paint.options.front().names = {"--colour-of-the-background"};
    EXPECT_TRUE(HasPart(HelpText(paint), "  --colour-of-the-background NAME\n                          The"))
        << HelpText(paint);
}

TEST(RoffText, HasNothingThatManTakesForAnInstruction) {
    EXPECT_EQ(RoffText(".SH x"), "\\&.SH x");
    EXPECT_EQ(RoffText("'x"), "\\&\\(aqx");
    EXPECT_EQ(RoffText("a\n.b"), "a\n\\&.b");
    EXPECT_EQ(RoffText("a.b -c \\n"), "a.b \\-c \\en");
}

TEST(ManualPage, HasExamplesAsTheyAreTyped) {
    const std::string page = ManualPage(SmallProgram());
    EXPECT_TRUE(HasPart(page, "screenshare paint \\(aq.\\en\\(aq \\-\\-to a\\-b\n")) << page;
    EXPECT_TRUE(HasPart(page, "It\\(aqs a \\edot:\n")) << page;
    EXPECT_FALSE(HasPart(page, "\n.SH is")) << page;
}

TEST(BashCompletion, OffersEachOptionAndTheValuesThatAreKnown) {
    const std::string script = BashCompletion(SmallProgram());
    EXPECT_TRUE(HasPart(script, "\"--colour --into --platform\"")) << script;
    EXPECT_TRUE(HasPart(
        script, "'screenshare paint -c')\n            _screenshare_complete_words \"red green blue\""))
        << script;
    EXPECT_TRUE(HasPart(script, "'screenshare paint --into')\n            _screenshare_complete_files -d\n"))
        << script;
}

TEST(ExitMeanings, AreOneForEachCodeAndACommandMayTellThemMorePrecisely) {
    std::set<int> codes;
    for (const ExitMeaning& meaning : ExitMeanings()) {
        EXPECT_TRUE(codes.insert(meaning.code).second) << meaning.code;
        EXPECT_FALSE(meaning.text.empty()) << meaning.code;
    }
    const std::vector<ExitMeaning> own = ExitMeaningsWith({{EXIT_CODE_FAILED, "no paint"}});
    ASSERT_EQ(own.size(), ExitMeanings().size());
    EXPECT_EQ(own[1], (ExitMeaning{EXIT_CODE_FAILED, "no paint"}));
    EXPECT_EQ(own[0], ExitMeanings()[0]);
}

TEST(CommandTexts, AreThereForEachCommandThatHelpPointsTo) {
    for (const char* const name : {"list", "thumbnails", "explain", "capture", "doctor", "demo"}) {
        const CommandText& text = TextOfCommand(name);
        EXPECT_EQ(text.name, name);
        EXPECT_FALSE(text.examples.empty()) << name;
        EXPECT_EQ(text.exitMeanings.size(), ExitMeanings().size()) << name;
    }
    EXPECT_EQ(TextOfCommand("paint").name, "");
}
