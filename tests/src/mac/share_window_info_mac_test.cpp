// SPDX-License-Identifier: Apache-2.0
#include "src/share_record_size.h"
#include "tests/support/fake_window_server.h"
#include "tests/support/trace_log.h"

#include <screenshare/share_engine.h>

#include <gtest/gtest.h>

#include <cstddef>
#include <cstring>
#include <limits>
#include <optional>
#include <string>
#include <vector>

// What a client's picker asks about a window.

namespace {

constexpr unsigned EDITOR = 11;
constexpr unsigned MAIL = 12;
constexpr unsigned LEFT = 1;
constexpr unsigned RIGHT = 2;
constexpr std::size_t ROOM = SHARE_WINDOW_TITLE_SIZE - 1;

const std::string U_UMLAUT = "\xC3\xBC";
const std::string EURO = "\xE2\x82\xAC";
const std::string FACE = "\xF0\x9F\x98\x80";
const std::string MENDED = "\xEF\xBF\xBD";

/// A record whose every byte but those of its size is 0x5A.
ShareWindowInfo Scribbled(unsigned structSize = sizeof(ShareWindowInfo)) {
    ShareWindowInfo info;
    std::memset(&info, 0x5A, sizeof info);
    info.structSize = structSize;
    return info;
}

bool IsUntouched(const ShareWindowInfo& info) {
    const ShareWindowInfo before = Scribbled(info.structSize);
    return std::memcmp(&info, &before, sizeof info) == 0;
}

/// Two displays side by side, and a window.
class ShareWindowInfoOf : public testing::Test {
protected:
    ShareWindowInfoOf() {
        server->SetDisplays(
            {FakeDisplay(LEFT, {{0, 0}, {1000, 800}}), FakeDisplay(RIGHT, {{1000, 0}, {500, 400}}, 2.0F)});
        Show("Letter");
    }

    void Show(const std::string& title, const platform::CGRect& frame = {{10, 20}, {300, 200}},
              bool onScreen = true) {
        platform::WindowInfo window = FakeWindow(EDITOR, 77, frame);
        window.title = title;
        window.onScreen = onScreen;
        server->SetWindows({window});
    }
    static ShareWindowInfo Asked() {
        ShareWindowInfo info = Scribbled();
        EXPECT_EQ(ShareGetWindowInfo(EDITOR, &info), 0);
        EXPECT_EQ(info.structSize, sizeof info);
        return info;
    }
    std::string TitleOf(const std::string& title) {
        Show(title);
        const ShareWindowInfo info = Asked();
        EXPECT_NE(std::memchr(info.title, 0, sizeof info.title), nullptr) << "not terminated";
        return {info.title, strnlen(info.title, sizeof info.title)};
    }

    CFakeWindowServerScope server;
};

} // namespace

// ---- Fields

TEST_F(ShareWindowInfoOf, TellsEveryField) {
    const ShareWindowInfo info = Asked();
    EXPECT_EQ(info.ownerPid, 77);
    EXPECT_EQ(info.displayId, LEFT);
    EXPECT_EQ(info.onScreen, 1);
    EXPECT_EQ(info.rect, (TVLRect{10, 20, 310, 220}));
    EXPECT_STREQ(info.title, "Letter");
    for (std::size_t i = 6; i < sizeof info.title; ++i)
        ASSERT_EQ(info.title[i], 0) << i;
}

TEST_F(ShareWindowInfoOf, IsOfThatWindowAndNoOther) {
    platform::WindowInfo mail = FakeWindow(MAIL, 88, {{1, 2}, {3, 4}});
    mail.title = "Inbox";
    server->SetWindows({FakeWindow(EDITOR, 77, {}), mail});
    ShareWindowInfo info = Scribbled();
    EXPECT_EQ(ShareGetWindowInfo(MAIL, &info), 0);
    EXPECT_EQ(info.ownerPid, 88);
    EXPECT_STREQ(info.title, "Inbox");
    EXPECT_STREQ(Asked().title, "");
}

TEST_F(ShareWindowInfoOf, TellsWhatIsOffTheScreen) {
    Show("Letter", {{10, 20}, {300, 200}}, false);
    const ShareWindowInfo info = Asked();
    EXPECT_EQ(info.onScreen, 0);
    EXPECT_EQ(info.rect, (TVLRect{10, 20, 310, 220}));
}

TEST_F(ShareWindowInfoOf, NamesTheDisplayOfItsLargestPart) {
    Show("", {{900, 0}, {300, 100}});
    EXPECT_EQ(Asked().displayId, RIGHT);
    Show("", {{900, 0}, {150, 100}});
    EXPECT_EQ(Asked().displayId, LEFT);
}

TEST_F(ShareWindowInfoOf, NamesTheMainDisplayWhereNoneShowsIt) {
    Show("", {{5000, 5000}, {10, 10}});
    EXPECT_EQ(Asked().displayId, LEFT);
    server->SetDisplays({});
    EXPECT_EQ(Asked().displayId, 0u);
}

TEST_F(ShareWindowInfoOf, CutsTheRectangleToWholePoints) {
    Show("", {{-10.7F, 20.9F}, {30.5F, 40.2F}});
    EXPECT_EQ(Asked().rect, (TVLRect{-10, 20, 20, 60}));
    Show("", {{std::numeric_limits<float>::quiet_NaN(), 0}, {1e30F, 5}});
    EXPECT_EQ(Asked().rect, (TVLRect{0, 0, std::numeric_limits<int>::max(), 5}));
}

// ---- Titles

TEST_F(ShareWindowInfoOf, KeepsATitleThatJustFits) {
    const std::string title(ROOM, 'x');
    EXPECT_EQ(TitleOf(title), title);
    EXPECT_EQ(TitleOf(title + "y"), title);
    EXPECT_EQ(TitleOf(std::string(100000, 'x')), title);
}

TEST_F(ShareWindowInfoOf, EndsATitleWithAWholeCharacter) {
    for (const std::string& character : {U_UMLAUT, EURO, FACE}) {
        // Every place that the cut may have in the character, and the one behind it, where the character
        // fits.
        for (std::size_t inside = 0; inside <= character.size(); ++inside) {
            const std::string before(ROOM - inside, 'x');
            const bool fits = inside == character.size();
            EXPECT_EQ(TitleOf(before + character + "tail"), fits ? before + character : before)
                << character << " " << inside;
        }
    }
}

TEST_F(ShareWindowInfoOf, MendsBytesThatAreNoCharacters) {
    EXPECT_EQ(TitleOf("a\xFFz"), "a" + MENDED + "z");
    EXPECT_EQ(TitleOf("torn \xE2\x82"), "torn " + MENDED + MENDED);
    EXPECT_EQ(TitleOf("\xC0\xAF"), MENDED + MENDED) << "overlong";
    EXPECT_EQ(TitleOf("\xED\xA0\x80"), MENDED + MENDED + MENDED) << "a surrogate";
    std::string many;
    for (std::size_t i = 0; i < ROOM / 3; ++i)
        many += MENDED;
    EXPECT_EQ(TitleOf(std::string(ROOM, '\x80')), many) << "mended before it is cut";
}

TEST_F(ShareWindowInfoOf, EndsATitleAtAZeroInIt) {
    EXPECT_EQ(TitleOf(std::string("seen\0hidden", 11)), "seen");
    EXPECT_EQ(TitleOf(""), "");
}

// ---- Sizes

TEST_F(ShareWindowInfoOf, ServesANewerRecordAsFarAsItIsKnown) {
    struct Newer {
        ShareWindowInfo known;
        int unknown[1000];
    };
    Newer newer;
    std::memset(&newer, 0x5A, sizeof newer);
    newer.known.structSize = sizeof newer;
    EXPECT_EQ(ShareGetWindowInfo(EDITOR, &newer.known), 0);
    EXPECT_EQ(newer.known.structSize, sizeof newer);
    EXPECT_STREQ(newer.known.title, "Letter");
    for (const int word : newer.unknown)
        ASSERT_EQ(word, 0x5A5A5A5A);
}

TEST(ShareFillRecord, ServesAnOlderRecordAsFarAsItGoes) {
    struct Grown {
        unsigned structSize;
        int first;
        int second;
        int third;
    };
    const Grown known{0, 1, 2, 3};
    for (const unsigned fields : {2u, 3u, 4u}) {
        Grown clients{};
        std::memset(&clients, 0x5A, sizeof clients);
        clients.structSize = fields * sizeof(int);
        ShareFillRecord(known, &clients);
        EXPECT_EQ(clients.structSize, fields * sizeof(int));
        EXPECT_EQ(clients.first, 1);
        EXPECT_EQ(clients.second, fields > 2 ? 2 : 0x5A5A5A5A);
        EXPECT_EQ(clients.third, fields > 3 ? 3 : 0x5A5A5A5A);
    }
}

TEST_F(ShareWindowInfoOf, WritesNothingBehindARecordOfTheFirstVersion) {
    struct First {
        unsigned structSize;
        int ownerPid;
        unsigned displayId;
        int onScreen;
        TVLRect rect;
        char title[512];
    };
    static_assert(sizeof(First) == 544);
    std::vector<unsigned char> memory(sizeof(ShareWindowInfo) + 64, 0x5A);
    const unsigned size = sizeof(First);
    std::memcpy(memory.data(), &size, sizeof size);
    EXPECT_EQ(ShareGetWindowInfo(EDITOR, reinterpret_cast<ShareWindowInfo*>(memory.data())), 0);
    First first;
    std::memcpy(&first, memory.data(), sizeof first);
    EXPECT_EQ(first.structSize, size);
    EXPECT_EQ(first.ownerPid, 77);
    EXPECT_EQ(first.rect, (TVLRect{10, 20, 310, 220}));
    EXPECT_STREQ(first.title, "Letter");
    for (std::size_t i = sizeof first; i < memory.size(); ++i)
        ASSERT_EQ(memory[i], 0x5A) << i;
}

TEST_F(ShareWindowInfoOf, RefusesBadArgumentsAndWritesNothing) {
    EXPECT_EQ(ShareGetWindowInfo(EDITOR, nullptr), -2);
    EXPECT_EQ(ShareGetWindowInfo(0, nullptr), -2);
    ShareWindowInfo info = Scribbled();
    EXPECT_EQ(ShareGetWindowInfo(0, &info), -2);
    EXPECT_TRUE(IsUntouched(info));
    for (const unsigned size : {0u, 1u, 32u, 543u}) {
        info = Scribbled(size);
        EXPECT_EQ(ShareGetWindowInfo(EDITOR, &info), -2) << size;
        EXPECT_TRUE(IsUntouched(info)) << size;
    }
}

// ---- What is gone

TEST_F(ShareWindowInfoOf, FailsForAWindowThatIsGoneAndWritesNothing) {
    ShareWindowInfo info = Scribbled();
    const CTraceLog trace;
    EXPECT_EQ(ShareGetWindowInfo(MAIL, &info), -1);
    server->SetWindows({});
    EXPECT_EQ(ShareGetWindowInfo(EDITOR, &info), -1);
    EXPECT_EQ(ShareGetWindowInfo(0xFFFFFFFFu, &info), -1);
    EXPECT_TRUE(IsUntouched(info));
    EXPECT_TRUE(trace.Lines().empty()) << "nothing that a log has to tell";
}

TEST_F(ShareWindowInfoOf, FailsForAWindowThatGoesWhileItIsListed) {
    struct Picker : ITvlEnumWindowsCallback {
        explicit Picker(CFakeWindowServer& desktop) : server(desktop) {}
        bool OnWindow(unsigned window) override {
            ShareWindowInfo info = Scribbled();
            results.push_back(ShareGetWindowInfo(window, &info));
            server.SetWindows({});
            return true;
        }
        CFakeWindowServer& server;
        std::vector<int> results;
    };
    server->SetWindows({FakeWindow(EDITOR, 77, {{0, 0}, {5, 5}}), FakeWindow(MAIL, 88, {{0, 0}, {5, 5}})});
    Picker picker(*server);
    EXPECT_EQ(TvlEnumWindows(&picker, SHARE_WINDOW_ENUM_NORMAL), 0);
    EXPECT_EQ(picker.results, (std::vector<int>{0, -1}));
}

TEST_F(ShareWindowInfoOf, FailsWithoutAWindowServer) {
    server->SetLife(platform::Life::Lost);
    ShareWindowInfo info = Scribbled();
    EXPECT_EQ(ShareGetWindowInfo(EDITOR, &info), -1);
    EXPECT_TRUE(IsUntouched(info));
}
