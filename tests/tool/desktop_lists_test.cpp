// SPDX-License-Identifier: Apache-2.0
#include "tools/desktop_lists.h"
#include "tests/src/mac/backend_tools.h"
#include "tools/list_rows.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

using namespace platform;

namespace {

Scene OneOfEach() {
    return Scene()
        .Display(0, 0, 200, 120)
        .App(1001, "Desktop")
        .Kind(ApplicationKind::Other)
        .Window(1)
        .App(1002, "Editor")
        .Window(2)
        .Window(3)
        .Window(4)
        .OffScreen()
        .App(1003, "Helper")
        .BackgroundOnly()
        .App(1004, "Notes");
}

/// "1002 Editor 2; 1004 Notes 0; "
std::string Words(const std::vector<ListedApplication>& applications) {
    std::string words;
    for (const ListedApplication& each : applications)
        words += std::to_string(each.pid) + " " + each.name + " " + std::to_string(each.windows) + "; ";
    return words;
}

} // namespace

TEST(ListApplications, HasThoseThatCanBeSharedWithTheirWindowsOnTheScreen) {
    const CServedScene desktop(OneOfEach());
    EXPECT_EQ(Words(ListApplications()), "1002 Editor 2; 1004 Notes 0; ");
    desktop->SetOnScreen(4, true);
    desktop->SetOwner(3, 1004);
    EXPECT_EQ(Words(ListApplications()), "1002 Editor 2; 1004 Notes 1; ");
    desktop->EndApplication(1002);
    EXPECT_EQ(Words(ListApplications()), "1004 Notes 1; ");
}

TEST(ListApplications, CutsALongNameAtACharacter) {
    std::string name;
    while (name.size() < 300)
        name += "ä";
    const CServedScene desktop(Scene().Display(0, 0, 200, 120).App(1002, name));
    const std::vector<ListedApplication> applications = ListApplications();
    ASSERT_EQ(applications.size(), 1u);
    const std::string whole = name.substr(0, 254);
    EXPECT_TRUE(applications[0].name == whole || applications[0].name == whole + "\xEF\xBF\xBD")
        << applications[0].name;
}

TEST(Lists, AreEmptyWhileTheDesktopIsGone) {
    const CServedScene desktop(OneOfEach());
    for (const ListKind* const list : {&ListOfMonitors(), &ListOfWindows(), &ListOfApplications()}) {
        const ListRows before = list->look();
        EXPECT_FALSE(before.empty());
        desktop->Lose();
        EXPECT_TRUE(list->look().empty()) << list->headings[0];
        desktop->FindAgain();
        EXPECT_EQ(list->look(), before) << list->headings[0];
    }
}

TEST(Lists, HaveACellForEachHeading) {
    const CServedScene desktop(OneOfEach());
    for (const ListKind* const list : {&ListOfMonitors(), &ListOfWindows(), &ListOfApplications()}) {
        for (const ListRow& row : list->look())
            EXPECT_EQ(row.cells.size(), list->headings.size()) << row.json.Text();
    }
}

TEST(Lists, TellProgramsWhatTheyTellPeople) {
    const CServedScene desktop(OneOfEach());
    const ListRows rows = ApplicationRows({{7, "a \"b\"", 3}});
    ASSERT_EQ(rows.size(), 1u);
    EXPECT_EQ(rows[0].id, 7u);
    EXPECT_EQ(rows[0].cells, (std::vector<std::string>{"7", "a \"b\"", "3"}));
    EXPECT_EQ(rows[0].json.Text(), "{\"pid\": 7, \"name\": \"a \\\"b\\\"\", \"windows\": 3}");
    const ListRows windows = ListOfWindows().look();
    ASSERT_EQ(windows.size(), 3u);
    EXPECT_EQ(windows[0].id, 3u);
    EXPECT_EQ(windows[0].cells[1], "1002");
    EXPECT_EQ(windows[0].cells[2], "Editor");
}
