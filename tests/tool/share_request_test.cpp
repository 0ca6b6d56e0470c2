// SPDX-License-Identifier: Apache-2.0
#include "tools/share_request.h"

#include "tests/src/mac/backend_tools.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

using namespace platform;

namespace {

using Ids = std::vector<unsigned>;

constexpr unsigned EDITOR = 5'000'100;
constexpr unsigned OTHER_EDITOR = 5'000'200;
constexpr unsigned NOTES = 5'000'300;

Scene Desk() {
    return Scene()
        .Display(0, 0, 200, 120)
        .App(static_cast<pid_t>(EDITOR), "Editor")
        .Window(1)
        .Titled("Chapter One, draft")
        .Window(2)
        .Titled("Untitled")
        .App(static_cast<pid_t>(OTHER_EDITOR), "Editor")
        .Window(3)
        .Titled("Untitled")
        .App(static_cast<pid_t>(NOTES), "Notes")
        .Window(4)
        .Titled("Shopping")
        .Window(5)
        .Titled("Holidays");
}

class RequestByName : public testing::Test {
protected:
    CServedScene m_desktop{Desk()};
};

} // namespace

TEST_F(RequestByName, HasTheIdOfTheOneWithThatName) {
    ShareRequest request;
    request.windows = {2};
    request.windowTitles = {"Shopping", "Chapter One, draft"};
    EXPECT_EQ(CompleteRequest(request), "");
    EXPECT_EQ(request.windows, (Ids{2, 4, 1}));
    EXPECT_TRUE(request.windowTitles.empty());
    EXPECT_FALSE(request.monitor.has_value()) << "nothing stands in for it";

    ShareRequest apps;
    apps.appNames = {"Notes", "Notes"};
    EXPECT_EQ(CompleteRequest(apps), "");
    EXPECT_EQ(apps.apps, Ids{NOTES}) << "an application is one, however many windows it has";
}

TEST_F(RequestByName, IsRefusedWhenMoreThanOneHasIt) {
    ShareRequest request;
    request.windowTitles = {"Untitled"};
    const std::string problem = CompleteRequest(request);
    EXPECT_TRUE(problem == "there is more than one window 'Untitled': 2, 3" ||
                problem == "there is more than one window 'Untitled': 3, 2")
        << problem;
    ShareRequest apps;
    apps.appNames = {"Editor"};
    EXPECT_EQ(CompleteRequest(apps).find("there is more than one application with a window 'Editor': "), 0u);
}

TEST_F(RequestByName, IsRefusedWhenNobodyHasIt) {
    ShareRequest request;
    request.windowTitles = {"shopping"};
    EXPECT_EQ(CompleteRequest(request), "there is no window 'shopping'");
    ShareRequest apps;
    apps.appNames = {"Painter"};
    EXPECT_EQ(CompleteRequest(apps), "there is no application with a window 'Painter'");
}
