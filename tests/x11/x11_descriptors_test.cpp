// SPDX-License-Identifier: Apache-2.0
#include "tests/support/no_descriptors.h"
#include "tests/support/sanitizer.h"
#include "tests/x11/x11_fixture.h"

#include <gtest/gtest.h>
#include <signal.h>

#include <algorithm>
#include <chrono>
#include <optional>

/// The host has opened all that it may, and closes something later.

namespace {

using namespace platform;

class X11Descriptors : public X11Test {
protected:
    void SetUp() override {
        if (SCREENSHARE_TEST_SANITIZED != 0)
            GTEST_SKIP() << "a sanitizer needs descriptors of its own";
        X11Test::SetUp();
    }
    bool IsAlive() { return Server().GetLife().life == Life::Alive; }
};

} // namespace

TEST_F(X11Descriptors, AreWaitedForToConnect) {
    if (!Begin())
        return;
    Server().Rest(); // which ends the connection
    {
        const CNoDescriptorsScope none;
        EXPECT_TRUE(Server().GetDisplays()->empty());
        EXPECT_EQ(Server().GetLife().life, Life::Lost);
        EXPECT_EQ(Take({1}).picture, nullptr);
        CGPoint position;
        EXPECT_FALSE(Server().GetPointerPosition(position));
    }
    EXPECT_TRUE(ComesTrue([this] { return IsAlive() && !Server().GetDisplays()->empty(); }));
    const CGWindowID window = Add("window", "50 50 100 100 00ff00");
    EXPECT_NE(TakeWhenShown(window, GREEN), nullptr);
}

TEST_F(X11Descriptors, AreNotNeededForLookUps) {
    if (!Begin())
        return;
    const CGWindowID window = Add("window", "50 50 100 100 00ff00");
    const CNoDescriptorsScope none;
    const CGWindowID other = Add("other", "60 60 100 100 0000ff");
    EXPECT_TRUE(Application().Tell("destroy other"));
    EXPECT_TRUE(ComesTrue([&] { return Server().GetWindows()->Find(other) == nullptr; }));
    EXPECT_EQ(Listed(window).owner, Pid()) << "whose it is decides whether it is kept out";
    EXPECT_TRUE(IsAlive());
}

TEST_F(X11Descriptors, AreWaitedForToTakePictures) {
    if (!Begin())
        return;
    const CGWindowID window = Add("window", "50 50 100 100 00ff00");
    std::optional<CNoDescriptorsScope> none(std::in_place);
    for (int i = 0; i < 20; ++i) {
        const PicturePtr picture = TakeOne(window);
        EXPECT_TRUE(picture == nullptr || Shows(*picture, GREEN)) << "none, or the right one";
    }
    EXPECT_TRUE(IsAlive()) << "that is no loss";
    none.reset();
    EXPECT_NE(TakeWhenShown(window, GREEN), nullptr);
    auto displays = Server().GetDisplays();
    ASSERT_FALSE(displays->empty());
    none.emplace();
    auto opened = Server().OpenDisplayStream({displays->front().id, 1000, true});
    if (opened.stream != nullptr)
        opened.stream->TakeNewest(CmSteadyNow() + std::chrono::seconds(1));
    EXPECT_TRUE(IsAlive());
    none.reset();
    EXPECT_TRUE(ComesTrue([&] {
        if (opened.stream == nullptr)
            opened = Server().OpenDisplayStream({displays->front().id, 1000, true});
        return opened.stream != nullptr &&
               opened.stream->TakeNewest(CmSteadyNow() + std::chrono::seconds(1)).outcome ==
                   PictureOutcome::Ok;
    }));
}

TEST_F(X11Descriptors, AreWaitedForToHearOfTheEndOfAnApplication) {
    if (!Begin())
        return;
    const std::optional<pid_t> late = Desk().StartApplication("Late");
    ASSERT_TRUE(late);
    const auto isListed = [&](pid_t pid) {
        const auto applications = Server().GetApplications();
        return std::any_of(applications->begin(), applications->end(),
                           [pid](const ApplicationInfo& one) { return one.pid == pid; });
    };
    ASSERT_TRUE(ComesTrue([&] { return isListed(*late); }));
    {
        const CNoDescriptorsScope none;
        Add("window", "50 50 100 100 00ff00"); // has everybody looked at
        EXPECT_TRUE(isListed(Pid()) && isListed(*late));
        EXPECT_EQ(kill(*late, SIGKILL), 0);
    }
    EXPECT_TRUE(Desk().EndApplication(*late)); // which needs a descriptor to wait for it
    EXPECT_TRUE(ComesTrue([&] { return !isListed(*late); }));
    EXPECT_TRUE(isListed(Pid()));
}
