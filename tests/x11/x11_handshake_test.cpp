// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/x11_handshake.h"

#include "platform/x11/owned_descriptor.h"
#include "platform/x11/x11_connection.h"
#include "platform/x11/x11_failure.h"
#include "platform/x11/x11_greeting.h"
#include "tests/support/test_effort.h"
#include "tests/support/threads.h"
#include "tests/x11/x11_rig.h"
#include "util/cm_clock.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/eventfd.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <iterator>
#include <random>
#include <string>
#include <vector>

namespace {

using namespace platform::x11;
using namespace std::chrono_literals;
using Kind = XServerOptions::Kind;

Link ConnectTo(const std::string& display, std::chrono::nanoseconds patience = PATIENCE) {
    return ConnectToDisplay(display, CmSteadyNow() + patience, -1);
}

std::ptrdiff_t CountDescriptors() {
    return std::distance(std::filesystem::directory_iterator("/proc/self/fd"), {});
}

// ---- Authority files

void Append(Bytes& file, const std::string& text) {
    file.push_back(static_cast<std::uint8_t>(text.size() >> 8U));
    file.push_back(static_cast<std::uint8_t>(text.size() & 0xFFU));
    file.insert(file.end(), text.begin(), text.end());
}

constexpr unsigned LOCAL = 256;
constexpr unsigned WILD = 65535;
const char* const COOKIE_NAME = "MIT-MAGIC-COOKIE-1";

void AppendEntry(Bytes& file, unsigned family, const std::string& host, const std::string& number,
                 const std::string& name, const std::string& data) {
    file.push_back(static_cast<std::uint8_t>(family >> 8U));
    file.push_back(static_cast<std::uint8_t>(family & 0xFFU));
    for (const std::string& part : {host, number, name, data})
        Append(file, part);
}

Bytes BytesOf(const std::string& text) {
    return {text.begin(), text.end()};
}

TEST(FindCookie, GivesTheFirstThatFits) {
    Bytes file;
    AppendEntry(file, LOCAL, "elsewhere", "7", COOKIE_NAME, "1");
    AppendEntry(file, LOCAL, "here", "8", COOKIE_NAME, "2");
    AppendEntry(file, LOCAL, "here", "7", "ANOTHER-KIND", "3");
    AppendEntry(file, 0, "here", "7", COOKIE_NAME, "4");
    AppendEntry(file, LOCAL, "here", "7", COOKIE_NAME, "5");
    AppendEntry(file, LOCAL, "here", "7", COOKIE_NAME, "6");
    EXPECT_EQ(FindCookie(file, "here", "7"), BytesOf("5"));
    EXPECT_EQ(FindCookie(file, "here", "9"), Bytes());
}

TEST(FindCookie, TakesAnyHostAndAnyNumberWhereTheEntrySaysSo) {
    Bytes file;
    AppendEntry(file, WILD, "", "7", COOKIE_NAME, "of any host");
    AppendEntry(file, LOCAL, "here", "", COOKIE_NAME, "of any number");
    EXPECT_EQ(FindCookie(file, "here", "7"), BytesOf("of any host"));
    EXPECT_EQ(FindCookie(file, "here", "8"), BytesOf("of any number"));
}

TEST(FindCookie, StopsWhereTheFileEnds) {
    Bytes file;
    AppendEntry(file, LOCAL, "here", "7", COOKIE_NAME, "cookie");
    while (!file.empty()) {
        file.pop_back();
        EXPECT_EQ(FindCookie(file, "here", "7"), Bytes()) << file.size();
    }
    const Bytes huge = BytesOf("\xFF\xFF\xFF\xFF");
    EXPECT_EQ(FindCookie(huge, "here", "7"), Bytes());
}

// ---- Greetings

TEST(MakeGreeting, SaysTheCookieAndPadsIt) {
    EXPECT_EQ(MakeGreeting({}).size(), 12u);
    const Bytes greeting = MakeGreeting(BytesOf("12345"));
    ASSERT_EQ(greeting.size(), 12u + 20u + 8u);
    EXPECT_EQ(std::string(greeting.begin() + 12, greeting.begin() + 30), COOKIE_NAME);
    EXPECT_EQ(std::string(greeting.begin() + 32, greeting.begin() + 37), "12345");
}

/// A welcome with one screen of one depth with one visual.
Bytes Welcome() {
    xcb_setup_t setup{};
    setup.status = 1;
    setup.vendor_len = 3;
    setup.pixmap_formats_len = 1;
    setup.roots_len = 1;
    setup.resource_id_mask = 0x1FFFFF;
    xcb_screen_t screen{};
    screen.allowed_depths_len = 1;
    xcb_depth_t depth{};
    depth.visuals_len = 1;
    const std::size_t size =
        sizeof setup + 4 + sizeof(xcb_format_t) + sizeof screen + sizeof depth + sizeof(xcb_visualtype_t);
    setup.length = static_cast<std::uint16_t>((size - 8) / 4);
    Bytes bytes(size);
    std::memcpy(bytes.data(), &setup, sizeof setup);
    std::size_t place = sizeof setup + 4 + sizeof(xcb_format_t);
    std::memcpy(bytes.data() + place, &screen, sizeof screen);
    std::memcpy(bytes.data() + place + sizeof screen, &depth, sizeof depth);
    return bytes;
}

TEST(IsSoundWelcome, RefusesWhatDoesNotLetUsIn) {
    Bytes answer = Welcome();
    ASSERT_TRUE(IsSoundWelcome(answer));
    for (const std::uint8_t status : {std::uint8_t{0}, std::uint8_t{2}, std::uint8_t{255}}) {
        answer[0] = status;
        EXPECT_FALSE(IsSoundWelcome(answer));
    }
}

TEST(IsSoundWelcome, RefusesWhatReachesBeyondItsEnd) {
    const Bytes sound = Welcome();
    xcb_setup_t setup;
    std::memcpy(&setup, sound.data(), sizeof setup);
    const auto with = [&sound](const xcb_setup_t& changed) {
        Bytes bytes = sound;
        std::memcpy(bytes.data(), &changed, sizeof changed);
        return bytes;
    };
    xcb_setup_t changed = setup;
    changed.vendor_len = 0xFFFF;
    EXPECT_FALSE(IsSoundWelcome(with(changed)));
    changed = setup;
    changed.pixmap_formats_len = 255;
    EXPECT_FALSE(IsSoundWelcome(with(changed)));
    changed = setup;
    changed.roots_len = 2;
    EXPECT_FALSE(IsSoundWelcome(with(changed)));
    changed = setup;
    changed.roots_len = 0;
    EXPECT_FALSE(IsSoundWelcome(with(changed)));
    changed = setup;
    changed.resource_id_mask = 0;
    EXPECT_FALSE(IsSoundWelcome(with(changed)));
    for (std::size_t size = 0; size < sound.size(); ++size)
        EXPECT_FALSE(IsSoundWelcome(Bytes(sound.begin(), sound.begin() + static_cast<std::ptrdiff_t>(size))));
}

TEST(IsSoundWelcome, LetsXcbWalkWhateverItAccepts) {
    const int count = 200'000 * TestEffort();
    constexpr unsigned SEED = 99;
    std::mt19937 random(SEED);
    const Bytes sound = Welcome();
    int accepted = 0;
    for (int i = 0; i < count; ++i) {
        Bytes bytes = sound;
        for (int changes = 1 + static_cast<int>(random() % 3); changes > 0; --changes)
            bytes[8 + random() % (bytes.size() - 8)] = static_cast<std::uint8_t>(random());
        if (!IsSoundWelcome(bytes))
            continue;
        ++accepted;
        // As libxcb does it; a memory checker sees a step too far.
        const auto* const setup = reinterpret_cast<const xcb_setup_t*>(bytes.data());
        for (auto screens = xcb_setup_roots_iterator(setup); screens.rem > 0; xcb_screen_next(&screens)) {
            const auto* const place = reinterpret_cast<const std::uint8_t*>(screens.data + 1);
            ASSERT_LE(place, bytes.data() + bytes.size());
            for (auto depths = xcb_screen_allowed_depths_iterator(screens.data); depths.rem > 0;
                 xcb_depth_next(&depths))
                ASSERT_LE(reinterpret_cast<const std::uint8_t*>(depths.data + 1),
                          bytes.data() + bytes.size());
        }
    }
    std::cout << count << " answers, " << accepted << " accepted, seed " << SEED << "\n";
    EXPECT_GT(accepted, count / 100);
}

// ---- Servers

/// A case that needs a server.
class Handshake : public testing::TestWithParam<Kind> {
protected:
    void SetUp() override {
        if (const auto missing = MissingProgram(XServer::ProgramsOf(GetParam())))
            GTEST_SKIP() << *missing;
    }
};

INSTANTIATE_TEST_SUITE_P(Servers, Handshake, testing::Values(Kind::Xvfb, Kind::Xorg),
                         [](const auto& each) { return each.param == Kind::Xvfb ? "Xvfb" : "Xorg"; });

TEST_P(Handshake, GivesAConnectionThatWorksAndIsCloseOnExec) {
    const XServer server({.kind = GetParam()});
    const std::ptrdiff_t before = CountDescriptors();
    {
        X11Connection connection(ConnectTo(server.Display()), -1);
        EXPECT_EQ(CountDescriptors(), before + 1);
        EXPECT_EQ(fcntl(connection.Descriptor(), F_GETFD), FD_CLOEXEC);
        connection.SetDeadline(CmSteadyNow() + PATIENCE);
        connection.Introduce();
        EXPECT_TRUE(connection.Has().composite && connection.Has().damage && connection.Has().randr);
        EXPECT_NE(connection.Atom(AtomName::NET_WM_PID), XCB_ATOM_NONE);
        const auto geometry =
            connection.Fetch<xcb_get_geometry_reply_t>(xcb_get_geometry(connection.Get(), connection.Root()));
        ASSERT_NE(geometry, nullptr);
        EXPECT_GT(geometry->width, 0);
    }
    EXPECT_EQ(CountDescriptors(), before);
}

TEST_P(Handshake, GivesUpAtTheDeadlineWhenTheServerIsStopped) {
    XServer server({.kind = GetParam()});
    const std::ptrdiff_t before = CountDescriptors();
    server.Stop();
    const auto asked = CmSteadyNow();
    EXPECT_EQ(ConnectTo(server.Display(), 200ms).connection, nullptr);
    EXPECT_GE(CmSteadyNow() - asked, 200ms);
    EXPECT_LT(CmSteadyNow() - asked, 5s);
    EXPECT_EQ(CountDescriptors(), before);
    server.Continue();
    EXPECT_NE(ConnectTo(server.Display()).connection, nullptr);
}

class Servers : public testing::Test {
protected:
    void SetUp() override {
        if (const auto missing = MissingProgram({"Xvfb"}))
            GTEST_SKIP() << *missing;
    }
};

TEST_F(Servers, LetInWhoHasTheCookieAndNobodyElse) {
    const CScratchFolder folder;
    const std::string file = folder.File("authority");
    Bytes entry;
    AppendEntry(entry, WILD, "", "", COOKIE_NAME, "0123456789abcdef");
    std::ofstream(file, std::ios::binary)
        .write(reinterpret_cast<const char*>(entry.data()), static_cast<std::streamsize>(entry.size()));
    setenv("XAUTHORITY", file.c_str(), 1);
    const XServer server({.arguments = {"-auth", file}});
    EXPECT_NE(ConnectTo(server.Display()).connection, nullptr);
    setenv("XAUTHORITY", folder.File("none").c_str(), 1);
    EXPECT_EQ(ConnectTo(server.Display()).connection, nullptr);
    unsetenv("XAUTHORITY");
}

TEST_F(Servers, AreFoundByTheVariableAndByAnyNameOfThisMachine) {
    const XServer server;
    const std::string number = std::to_string(server.Number());
    setenv("DISPLAY", server.Display().c_str(), 1);
    EXPECT_NE(ConnectTo("").connection, nullptr);
    EXPECT_EQ(ConnectTo("unix:" + number + ".0").screen, 0);
    EXPECT_NE(ConnectTo("unix:" + number).connection, nullptr);
    EXPECT_EQ(ConnectTo(":" + number + ".1").connection, nullptr) << "there is one screen";
    EXPECT_EQ(ConnectTo("other.invalid:" + number).connection, nullptr) << "no other machine is asked";
    unsetenv("DISPLAY");
    EXPECT_EQ(ConnectTo("").connection, nullptr);
}

TEST_F(Servers, ThatAreGoneRefuseAtOnce) {
    XServer server;
    server.Kill();
    const auto asked = CmSteadyNow();
    EXPECT_EQ(ConnectTo(server.Display()).connection, nullptr);
    EXPECT_LT(CmSteadyNow() - asked, PATIENCE / 2);
}

TEST_F(Servers, AreNotWaitedForOnceSomebodyWakesUs) {
    XServer server;
    server.Stop();
    const OwnedDescriptor wakes(eventfd(1, EFD_CLOEXEC));
    const auto asked = CmSteadyNow();
    EXPECT_EQ(ConnectToDisplay(server.Display(), CmSteadyNow() + PATIENCE, wakes.Get()).connection, nullptr);
    EXPECT_LT(CmSteadyNow() - asked, PATIENCE / 2);
}

TEST_F(Servers, AreNotWaitedForWithoutEndOnAClockThatStands) {
    XServer server;
    X11Connection connection(ConnectTo(server.Display()), -1);
    server.Stop();
    const CManualClockScope clock;
    EXPECT_EQ(ConnectTo(server.Display(), 1h).connection, nullptr);
    connection.SetDeadline(CmSteadyNow() + 1h);
    EXPECT_THROW(connection.RoundTrip(), Unanswered);
}

/// Who listens as a display and accepts nobody: soon nobody more can wait in line. Its name is an abstract
/// one, as servers in containers have it, and its number is higher than people's.
class DeafListener {
public:
    DeafListener() {
        const std::string name = "/tmp/.X11-unix/X" + std::to_string(Number());
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        name.copy(address.sun_path + 1, sizeof address.sun_path - 1);
        const auto size = static_cast<socklen_t>(offsetof(sockaddr_un, sun_path) + 1 + name.size());
        const auto* const place = reinterpret_cast<const sockaddr*>(&address);
        EXPECT_EQ(bind(m_socket.Get(), place, size), 0);
        EXPECT_EQ(listen(m_socket.Get(), 0), 0);
        OwnedDescriptor first(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
        EXPECT_EQ(connect(first.Get(), place, size), 0);
        m_inLine = std::move(first);
    }

    static int Number() { return 100'000 + getpid() % 100'000; }
    void Accept() { m_accepted = OwnedDescriptor(accept4(m_socket.Get(), nullptr, nullptr, SOCK_CLOEXEC)); }

private:
    const OwnedDescriptor m_socket{socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)};
    OwnedDescriptor m_inLine;
    OwnedDescriptor m_accepted;
};

TEST(AbstractServers, AreFoundAndGivenUpAtTheDeadlineWhileTheirQueueIsFull) {
    DeafListener listener;
    const std::string display = ":" + std::to_string(DeafListener::Number());
    const auto asked = CmSteadyNow();
    EXPECT_EQ(ConnectTo(display, 200ms).connection, nullptr);
    EXPECT_GE(CmSteadyNow() - asked, 200ms);
    EXPECT_LT(CmSteadyNow() - asked, 5s);
    listener.Accept(); // now there is room, and still no answer
    EXPECT_EQ(ConnectTo(display, 200ms).connection, nullptr);
    EXPECT_GE(CmSteadyNow() - asked, 400ms);
}

TEST_F(Servers, GiveIdsAgainWithoutBeingWaitedForWithoutEnd) {
    XServer server;
    X11Connection connection(ConnectTo(server.Display()), -1);
    connection.SetDeadline(CmSteadyNow() + PATIENCE);
    connection.Introduce();
    const xcb_setup_t& setup = *xcb_get_setup(connection.Get());
    const xcb_pixmap_t kept = connection.NewId();
    xcb_create_pixmap(connection.Get(), 1, kept, connection.Root(), 1, 1);
    const std::uint64_t all = std::uint64_t{setup.resource_id_mask} + 1;
    for (std::uint64_t i = 0; i + 1 < all; ++i)
        ASSERT_EQ(connection.NewId() & ~setup.resource_id_mask, setup.resource_id_base);
    // All have been given out: from here on the server says what is free.
    for (std::uint64_t i = 0; i + 1 < all; ++i)
        ASSERT_NE(connection.NewId(), kept);
    server.Stop();
    connection.SetDeadline(CmSteadyNow() + 200ms);
    EXPECT_THROW(
        {
            for (std::uint64_t i = 0; i < 2 * all; ++i)
                connection.NewId();
        },
        Unanswered);
}

TEST_F(Servers, ThatAreStoppedLeaveOneUnansweredAndAnswerLater) {
    XServer server;
    X11Connection connection(ConnectTo(server.Display()), -1);
    server.Stop();
    connection.SetDeadline(CmSteadyNow() + 100ms);
    EXPECT_THROW(connection.RoundTrip(), Unanswered);
    server.Continue();
    connection.SetDeadline(CmSteadyNow() + PATIENCE);
    EXPECT_NO_THROW(connection.RoundTrip());
    server.Kill();
    EXPECT_THROW(connection.RoundTrip(), Lost);
    EXPECT_THROW(connection.NextEvent(), Lost);
}

/// Requests without end to a server that takes none in.
TEST_F(Servers, ThatTakeNothingInAreGivenUpAtTheDeadlineToo) {
    XServer server;
    X11Connection connection(ConnectTo(server.Display()), -1);
    server.Stop();
    connection.SetDeadline(CmSteadyNow() + 200ms);
    EXPECT_THROW(
        {
            for (int i = 0; i < 1'000'000; ++i) {
                xcb_no_operation(connection.Get());
                if (i % 1000 == 0)
                    connection.Flush();
            }
        },
        Unanswered);
}

} // namespace
