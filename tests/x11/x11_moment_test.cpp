// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/x11_session.h"
#include "tests/support/sanitizer.h"
#include "tests/x11/x11_fixture.h"

#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <functional>
#include <thread>

/// How long the server says, without asking, that its last picture holds.
namespace {

using namespace platform;
using namespace std::chrono_literals;

class X11Moment : public X11Test {
protected:
    /// One window that has painted itself.
    [[nodiscard]] bool BeginWithWindow(const X11DeskOptions& options = {}) {
        if (!Begin(options))
            return false;
        m_window = Desk().AddWindow(Pid(), {{20, 30}, {100, 80}}, GREEN).value_or(0);
        return TakeWhenShown(m_window, GREEN) != nullptr;
    }

    CGWindowID Window() const { return m_window; }

    std::shared_ptr<const WindowPicture> TakeIt() { return Take({m_window}).picture; }

    /// A picture whose moment stands; null when there never is one.
    std::shared_ptr<const WindowPicture> TakeUntilItStands() {
        std::shared_ptr<const WindowPicture> picture;
        const bool stands = ComesTrue([&] {
            picture = TakeIt();
            return picture != nullptr && picture->moment != 0 && Server().GetMoment() == picture->moment;
        });
        EXPECT_TRUE(stands);
        return stands ? picture : nullptr;
    }

    /// Whether it is over sooner than it would be by time alone; a busy machine gets several tries.
    testing::AssertionResult IsEndedBy(const std::function<bool()>& change) {
        for (int i = 0; i < 20; ++i) {
            const auto picture = TakeUntilItStands();
            const auto begin = CmSteadyNow();
            if (picture == nullptr || !change())
                return testing::AssertionFailure() << "it couldn't be tried";
            while (Server().GetMoment() == picture->moment)
                std::this_thread::yield();
            const auto time = CmSteadyNow() - begin;
            if (time < x11::X11Session::QUIET_LIMIT / 2)
                return testing::AssertionSuccess();
        }
        return testing::AssertionFailure() << "only time has ended it";
    }

private:
    CGWindowID m_window = 0;
};

TEST_F(X11Moment, StandsOnAQuietDesktopForAsLongAsTheServerNeedNotAnswer) {
    if (!BeginWithWindow())
        return;
    std::shared_ptr<const WindowPicture> picture;
    auto begin = CmSteadyNow();
    EXPECT_TRUE(ComesTrue([&] {
        picture = TakeUntilItStands();
        begin = CmSteadyNow();
        int times = 0;
        while (picture != nullptr && times <= 100 && Server().GetMoment() == picture->moment)
            ++times;
        return times > 100;
    })) << "not even for a while";
    ASSERT_NE(picture, nullptr);
    while (CmSteadyNow() < begin + x11::X11Session::QUIET_LIMIT)
        std::this_thread::yield();
    EXPECT_EQ(Server().GetMoment(), 0U);
    // Nothing has changed, so it has its name again once the server was asked.
    EXPECT_TRUE(ComesTrue([&] {
        const auto next = TakeIt();
        return next->moment == picture->moment && Server().GetMoment() == picture->moment;
    }));
}

TEST_F(X11Moment, IsSharedByPicturesOfOtherWindows) {
    if (!BeginWithWindow())
        return;
    const CGWindowID other = Desk().AddWindow(Pid(), {{200, 30}, {100, 80}}, BLUE).value_or(0);
    ASSERT_NE(TakeWhenShown(other, BLUE), nullptr);
    EXPECT_TRUE(ComesTrue([&] {
        const auto first = TakeUntilItStands();
        const auto second = Take({other}).picture;
        return first != nullptr && second != nullptr && second->moment == first->moment &&
               Server().GetMoment() == first->moment;
    }));
}

TEST_F(X11Moment, EndsWithEachThingThatIsSeenOrTold) {
    if (!BeginWithWindow())
        return;
    const CGWindowID other = Desk().AddWindow(Pid(), {{200, 30}, {100, 80}}, BLUE).value_or(0);
    ASSERT_NE(TakeWhenShown(other, BLUE), nullptr);
    int i = 0;
    EXPECT_TRUE(IsEndedBy([&] { return Desk().Recolour(Window(), ++i % 2 == 0 ? GREEN : BLUE); }));
    EXPECT_TRUE(IsEndedBy([&] {
        ++i;
        return Desk().SetFrame(Window(), {{20.0F + static_cast<float>(i), 30}, {100, 80}});
    }));
    EXPECT_TRUE(IsEndedBy([&] { return Desk().Raise(++i % 2 == 0 ? other : Window()); }));
    EXPECT_TRUE(IsEndedBy([&] { return Desk().SetTitle(Window(), "title " + std::to_string(++i)); }));
    EXPECT_TRUE(IsEndedBy([&] {
        ++i;
        return Desk().MovePointer({5.0F + static_cast<float>(i), 5});
    }));
    EXPECT_TRUE(IsEndedBy([&] { return Desk().ChangeCursor(); }));
    EXPECT_TRUE(IsEndedBy([&] { return Desk().AddWindow(Pid(), {{10, 10}, {30, 30}}, RED).has_value(); }));
    EXPECT_TRUE(IsEndedBy([&] {
        const auto more = Desk().AddWindow(Pid(), {{50, 10}, {30, 30}}, RED);
        return more && TakeUntilItStands() != nullptr && Desk().Close(*more);
    }));
}

TEST_F(X11Moment, EndsWithTheDisplayTheServerAndItsRest) {
    X11DeskOptions options;
    options.server.kind = XServerOptions::Kind::Xorg;
    if (!BeginWithWindow(options))
        return;
    EXPECT_TRUE(IsEndedBy([&] { return Desk().AddDisplay({640, 480}).has_value(); }));
    ASSERT_NE(TakeUntilItStands(), nullptr);
    Server().Rest();
    EXPECT_EQ(Server().GetMoment(), 0U);
    ASSERT_NE(TakeUntilItStands(), nullptr);
    Desk().Rig().Kill();
    EXPECT_EQ(Server().GetMoment(), 0U);
}

TEST_F(X11Moment, IsNotToldOfAWindowThatHasNotPaintedNorOnAClockThatIsMovedByHand) {
    if (!BeginWithWindow())
        return;
    const CGWindowID bare = Add("bare", "200 30 50 50 0000ff none idle");
    const auto picture = Take({bare}).picture;
    ASSERT_NE(picture, nullptr);
    EXPECT_EQ(picture->moment, 0U);
    ASSERT_NE(TakeUntilItStands(), nullptr);
    const CManualClockScope clock;
    EXPECT_EQ(Server().GetMoment(), 0U);
    EXPECT_EQ(TakeIt()->moment, 0U);
}

TEST_F(X11Moment, IsOverInAForkedChild) {
    if (!BeginWithWindow())
        return;
    ASSERT_NE(TakeUntilItStands(), nullptr);
    const pid_t child = fork();
    if (child == 0)
        _exit(Server().GetMoment() == 0 ? 0 : 1);
    int status = -1;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0);
}

} // namespace
