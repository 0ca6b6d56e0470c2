// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/arrivals.h"
#include "tests/support/threads.h"

#include <gtest/gtest.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <chrono>

/// What a thread that lends its connection is woken by.
namespace platform::x11 {
namespace {

using namespace std::chrono_literals;

class ArrivalsOfSocket : public testing::Test {
protected:
    void SetUp() override {
        ASSERT_TRUE(arrivals);
        ASSERT_EQ(socketpair(AF_UNIX, SOCK_STREAM, 0, m_pair.data()), 0);
        ASSERT_TRUE(arrivals.Open(m_pair[0]));
    }
    void TearDown() override {
        arrivals.Close();
        close(m_pair[0]);
        HangUp();
    }

    void Send() { ASSERT_EQ(write(m_pair[1], "x", 1), 1); }
    void Receive() {
        char byte = 0;
        ASSERT_EQ(read(m_pair[0], &byte, 1), 1);
    }
    void HangUp() {
        if (m_pair[1] >= 0)
            close(m_pair[1]);
        m_pair[1] = -1;
    }
    void Use() {
        EXPECT_TRUE(arrivals.BeginUse());
        EXPECT_TRUE(arrivals.EndUse());
    }
    bool AreHeard(std::chrono::milliseconds wait = 0ms) {
        pollfd waits{arrivals.Descriptor(), POLLIN, 0};
        return poll(&waits, 1, static_cast<int>(wait.count())) > 0;
    }

    Arrivals arrivals;

private:
    std::array<int, 2> m_pair{-1, -1};
};

TEST_F(ArrivalsOfSocket, AreHeardButWhileSomebodyUsesTheConnection) {
    EXPECT_FALSE(AreHeard());
    Send();
    EXPECT_TRUE(AreHeard());
    EXPECT_TRUE(arrivals.BeginUse());
    EXPECT_FALSE(AreHeard());
    EXPECT_TRUE(arrivals.EndUse());
    EXPECT_TRUE(AreHeard());
    EXPECT_TRUE(arrivals.Listen());
    EXPECT_TRUE(AreHeard());
    Receive();
    EXPECT_FALSE(AreHeard());
}

TEST_F(ArrivalsOfSocket, AreNotHeardBetweenUsesThatComeOneAfterTheOther) {
    const auto begin = CmSteadyNow();
    Use();
    Use();
    Send();
    const bool wereHeard = AreHeard();
    if (CmSteadyNow() - begin < Arrivals::LEASE) { // else the machine was too busy
        EXPECT_FALSE(wereHeard);
    }
    EXPECT_TRUE(AreHeard(PATIENCE)) << "the lease doesn't end";
    EXPECT_GE(CmSteadyNow() - begin, Arrivals::LEASE / 2);
    EXPECT_TRUE(arrivals.Listen());
    EXPECT_TRUE(AreHeard());
    Receive();
    EXPECT_FALSE(AreHeard()) << "by the timer, which has been seen to";
}

TEST_F(ArrivalsOfSocket, StayUnheardForAsLongAsSomebodyLooks) {
    Use();
    arrivals.NoteUse();
    Send();
    EXPECT_TRUE(AreHeard()) << "nobody has taken what has come";
    Receive();
    const auto begin = CmSteadyNow();
    auto last = begin;
    arrivals.NoteUse();
    Use();
    Send();
    while (last < begin + 3 * Arrivals::LEASE) {
        const bool areHeard = AreHeard();
        const auto now = CmSteadyNow();
        if (now - last >= Arrivals::LEASE / 2)
            GTEST_SKIP() << "the machine is too busy";
        ASSERT_FALSE(areHeard);
        arrivals.NoteUse();
        last = CmSteadyNow();
    }
    EXPECT_TRUE(AreHeard(PATIENCE));
    EXPECT_LT(CmSteadyNow() - last, Arrivals::LEASE + 5s);
}

TEST_F(ArrivalsOfSocket, TellOfABrokenConnectionAtOnce) {
    Use();
    Use();
    HangUp();
    EXPECT_TRUE(AreHeard());
    EXPECT_TRUE(arrivals.Listen());
    EXPECT_TRUE(AreHeard());
}

TEST_F(ArrivalsOfSocket, AreHeardAfterEachUseOnAClockThatIsMovedByHand) {
    const CManualClockScope clock;
    Send();
    for (int i = 0; i < 3; ++i) {
        Use();
        EXPECT_TRUE(AreHeard());
    }
}

TEST_F(ArrivalsOfSocket, OfAnotherSocketAreHeardFromTheBeginning) {
    Use();
    Use();
    arrivals.Close();
    std::array<int, 2> other{};
    ASSERT_EQ(socketpair(AF_UNIX, SOCK_STREAM, 0, other.data()), 0);
    ASSERT_TRUE(arrivals.Open(other[0]));
    EXPECT_FALSE(AreHeard(2 * std::chrono::duration_cast<std::chrono::milliseconds>(Arrivals::LEASE)))
        << "the former lease goes on";
    ASSERT_EQ(write(other[1], "x", 1), 1);
    EXPECT_TRUE(AreHeard());
    arrivals.Close();
    close(other[0]);
    close(other[1]);
}

} // namespace
} // namespace platform::x11
