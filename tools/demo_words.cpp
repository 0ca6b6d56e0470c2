// SPDX-License-Identifier: Apache-2.0
#include "tools/demo_words.h"

#include "tools/capture_options.h"
#include "tools/text_table.h"

#include <algorithm>
#include <array>
#include <cstdio>

namespace {

constexpr int TERMINAL_COLUMNS = 79;

/// Below that, nothing moves on the screen.
constexpr double STILL_FRAMES_PER_SECOND = 5;

std::string SizeOf(const platform::CGImageRef& image) {
    if (image == nullptr)
        return "";
    return std::to_string(platform::CGImageGetWidth(image.get())) + "x" +
           std::to_string(platform::CGImageGetHeight(image.get()));
}

std::string RateOf(const DemoShot& shot) {
    std::array<char, 32> text{};
    std::snprintf(text.data(), text.size(), "%.0f", shot.framesPerSecond);
    return shot.picture != nullptr ? text.data() : "";
}

bool WaitsForChanges(const DemoShot& shot) {
    const bool isSession = shot.mode == SCREEN_CAPTURER_TYPE_AVFOUNDATION ||
                           shot.mode == SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX;
    return isSession && shot.picture != nullptr && shot.framesPerSecond < STILL_FRAMES_PER_SECOND;
}

std::string RemarkOf(const ShownShot& shown) {
    if (shown.shot.picture == nullptr || !shown.shot.remark.empty())
        return shown.shot.remark;
    if (shown.tally.isPlain)
        return "all of one colour";
    return WaitsForChanges(shown.shot) ? "sends more when something moves" : "";
}

std::string CaptionOf(const ShownShot& shown) {
    if (shown.shot.picture == nullptr || !shown.shot.remark.empty())
        return RemarkOf(shown);
    const std::string rate = RateOf(shown.shot);
    return SizeOf(shown.shot.picture) + ", " + rate + (rate == "1" ? " frame" : " frames") + " a second";
}

bool HasPicture(const DemoFindings& findings) {
    return std::any_of(findings.shots.begin(), findings.shots.end(),
                       [](const ShownShot& shown) { return shown.shot.picture != nullptr; });
}

std::int64_t Sum(const DemoFindings& findings, std::int64_t PixelTally::*part) {
    std::int64_t sum = 0;
    for (const ShownShot& shown : findings.shots)
        sum += shown.tally.*part;
    return sum;
}

std::string PlaceWords(const DemoSubject& subject) {
    if (subject.isScene)
        return "In its place they have the page that it covers. Of an application others see the "
               "windows on one monitor, and a plain colour around them.";
    return "In its place they have what lies behind it or, where mode session can't know that, a plain "
           "colour.";
}

std::string CountWords(const DemoFindings& findings) {
    return "Counted: " + std::to_string(findings.screenTally.secret) +
           " of its pixels are on the screen; among the " +
           std::to_string(Sum(findings, &PixelTally::pixels)) + " that others see there are " +
           std::to_string(Sum(findings, &PixelTally::secret)) + ".";
}

} // namespace

std::vector<SheetPicture> DemoPictures(const DemoFindings& findings) {
    const std::string caption = findings.screen != nullptr ? SizeOf(findings.screen) + ", as a person sees it"
                                                           : "no picture: this desktop does not show it";
    std::vector<SheetPicture> pictures{{"1  the screen", caption, findings.screen}};
    for (const ShownShot& shown : findings.shots)
        pictures.push_back({std::to_string(pictures.size() + 1) + "  what others see: mode " +
                                CaptureModeName(shown.shot.mode),
                            CaptionOf(shown), shown.shot.picture});
    return pictures;
}

std::vector<std::string> DemoLessons(const DemoSubject& subject, const DemoFindings& findings) {
    std::vector<std::string> lessons{"Shared: " + subject.shared + "."};
    if (!subject.note.empty())
        lessons.push_back(subject.note);
    if (const std::string problem = DemoProblem(subject, findings); !problem.empty()) {
        lessons.push_back("Not as it should be: " + problem + ".");
        return lessons;
    }
    if (subject.keptOut.empty())
        return lessons;
    lessons.push_back("Look at " + subject.keptOut +
                      ": it is on the screen (picture 1), and in none of the four pictures that others see.");
    lessons.push_back(PlaceWords(subject));
    if (subject.isScene)
        lessons.push_back(CountWords(findings));
    return lessons;
}

std::string DemoTable(const DemoSubject& subject, const DemoFindings& findings) {
    const auto row = [&subject](std::string name, const platform::CGImageRef& image, std::string rate,
                                const PixelTally& tally, std::string remark) {
        std::vector<std::string> cells{std::move(name), SizeOf(image), std::move(rate)};
        if (subject.isScene)
            cells.push_back(image != nullptr ? std::to_string(tally.secret) : "");
        cells.push_back(std::move(remark));
        return cells;
    };
    std::vector<std::string> headings{"MODE", "SIZE", "FRAMES/S"};
    if (subject.isScene)
        headings.emplace_back("KEPT-OUT PIXELS");
    headings.emplace_back("REMARK");
    TextTable table(headings);
    table.AddRow(row("(screen)", findings.screen, "", findings.screenTally,
                     findings.screen != nullptr ? "" : "it cannot be seen"));
    for (const ShownShot& shown : findings.shots)
        table.AddRow(row(CaptureModeName(shown.shot.mode), shown.shot.picture, RateOf(shown.shot),
                         shown.tally, RemarkOf(shown)));
    return table.Text();
}

std::string DemoProblem(const DemoSubject& subject, const DemoFindings& findings) {
    if (!HasPicture(findings))
        return "no way of capturing gave a picture; screenshare doctor may tell why";
    if (!subject.isScene)
        return "";
    if (findings.screenTally.secret == 0)
        return subject.keptOut + " is not on the screen, so the pictures prove nothing";
    for (const ShownShot& shown : findings.shots) {
        const std::string mode = "mode " + CaptureModeName(shown.shot.mode);
        if (shown.shot.picture == nullptr)
            return mode + " gave no picture";
        if (shown.tally.secret != 0)
            return subject.keptOut + " shows in the picture of " + mode + ", in " +
                   std::to_string(shown.tally.secret) + " pixels";
        if (shown.tally.isPlain)
            return "the picture of " + mode + " shows nothing";
    }
    return "";
}

std::string DemoText(const std::vector<std::string>& paragraphs) {
    std::string text;
    for (const std::string& paragraph : paragraphs) {
        for (const std::string& line : BrokenIntoLines(paragraph, TERMINAL_COLUMNS))
            text += line + "\n";
    }
    return text;
}
