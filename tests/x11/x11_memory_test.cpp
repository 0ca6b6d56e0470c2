// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/x11_memory.h"

#include <gtest/gtest.h>

#include <set>
#include <string>

namespace {

using namespace platform::x11;

constexpr std::uint32_t NAME = 0x200001;

TEST(WindowIds, GivesThePlainNameFirstAndTheSameUntilItsRelease) {
    WindowIds ids;
    EXPECT_EQ(ids.Claim(NAME, 5, false), NAME);
    EXPECT_EQ(ids.Claim(NAME, 6, false), NAME);
    EXPECT_EQ(ids.OwnerOf(NAME), 6);
    EXPECT_TRUE(ids.IsClaimed(NAME));
    ids.Release(NAME);
    EXPECT_FALSE(ids.IsClaimed(NAME));
    EXPECT_EQ(ids.OwnerOf(NAME), 0);
}

TEST(WindowIds, NeverGivesAnIdTwiceHoweverOftenANameIsUsed) {
    WindowIds ids;
    std::set<platform::CGWindowID> given;
    for (std::uint32_t use = 0; use <= WindowIds::LAST_INCARNATION; ++use) {
        const platform::CGWindowID id = ids.Claim(NAME, 5, false);
        EXPECT_NE(id, 0U);
        EXPECT_EQ(WindowIds::NameOf(id), NAME);
        EXPECT_TRUE(given.insert(id).second) << use;
        ids.Release(NAME);
    }
    for (int use = 0; use < 1000; ++use) {
        const platform::CGWindowID id = ids.Claim(NAME, 5, false);
        EXPECT_NE(id, 0U);
        EXPECT_EQ(ids.Claim(NAME, 5, false), id);
        EXPECT_TRUE(given.insert(id).second) << use;
        ids.Release(NAME);
    }
}

TEST(WindowIds, NeverGivesANameAnIdThatAnotherHasHadInItsStead) {
    constexpr std::uint32_t LAST_NAME = (1U << WindowIds::NAME_BITS) - 1;
    constexpr int USES = 40;
    WindowIds ids;
    std::set<platform::CGWindowID> given;
    const auto use = [&](std::uint32_t name) {
        ids.Release(name);
        const platform::CGWindowID id = ids.Claim(name, 5, false);
        EXPECT_NE(id, 0U);
        EXPECT_NE(id, ~platform::CGWindowID{0});
        EXPECT_TRUE(given.insert(id).second) << name << " got " << id;
        if (name % 3 != 0)
            ids.Release(name); // the others stay claimed up to their next use
    };
    for (int i = 0; i < USES; ++i) {
        for (const std::uint32_t distance : {0U, 1U, 4U, 5U, 7U, 30U, 31U})
            use(LAST_NAME - distance);
        use(NAME);
    }
}

TEST(WindowIds, CountsEachNameByItself) {
    WindowIds ids;
    for (std::uint32_t name = NAME; name < NAME + 3000; ++name) {
        for (std::uint32_t use = 0; use < name % 5; ++use) {
            ids.Claim(name, 5, false);
            ids.Release(name);
        }
    }
    for (std::uint32_t name = NAME; name < NAME + 3000; ++name)
        ASSERT_EQ(ids.Claim(name, 5, false) >> WindowIds::NAME_BITS, name % 5);
}

TEST(WindowIds, IgnoresAReleaseThatNobodyClaimed) {
    WindowIds ids;
    ids.Release(NAME);
    EXPECT_EQ(ids.Claim(NAME, 5, false), NAME);
}

TEST(WindowIds, GivesOurOwnWindowsThePlainNameAndCountsThemForOthers) {
    WindowIds ids;
    for (int use = 0; use < 3; ++use) {
        EXPECT_EQ(ids.Claim(NAME, 5, true), NAME);
        ids.Release(NAME);
    }
    EXPECT_EQ(ids.Claim(NAME, 6, false), NAME | (3U << WindowIds::NAME_BITS));
}

TEST(WindowIds, RefusesWhatIsNoName) {
    WindowIds ids;
    EXPECT_EQ(ids.Claim(0, 5, false), 0U);
    EXPECT_EQ(ids.Claim(1U << WindowIds::NAME_BITS, 5, true), 0U);
    EXPECT_EQ(ids.Claim((1U << WindowIds::NAME_BITS) - 1, 5, false), (1U << WindowIds::NAME_BITS) - 1);
}

TEST(WindowIds, ReleasesWhatIsGone) {
    WindowIds ids;
    ids.Claim(NAME, 5, false);
    ids.Claim(NAME + 1, 5, false);
    ids.ReleaseIf([](std::uint32_t name) { return name == NAME; });
    EXPECT_FALSE(ids.IsClaimed(NAME));
    EXPECT_TRUE(ids.IsClaimed(NAME + 1));
}

TEST(DisplayIds, GivesAMonitorTheSameIdInEveryProcess) {
    DisplayIds ids;
    DisplayIds others;
    others.IdOf("DP-2", "x");
    EXPECT_EQ(ids.IdOf("DP-1", "edid"), others.IdOf("DP-1", "edid"));
    EXPECT_EQ(ids.IdOf("DP-1", "edid"), ids.IdOf("DP-1", "edid"));
}

TEST(DisplayIds, TellsMonitorsApartAndGivesNoneAForbiddenId) {
    DisplayIds ids;
    std::set<platform::CGDirectDisplayID> given;
    EXPECT_NE(ids.IdOf("ab", "c"), ids.IdOf("a", "bc"));
    for (int monitor = 0; monitor < 2000; ++monitor) {
        const platform::CGDirectDisplayID id = ids.IdOf("DP-" + std::to_string(monitor), "");
        EXPECT_NE(id, 0U);
        EXPECT_NE(id, ~platform::CGDirectDisplayID{0});
        EXPECT_TRUE(given.insert(id).second);
    }
}

} // namespace
