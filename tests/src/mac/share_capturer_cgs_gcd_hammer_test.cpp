// SPDX-License-Identifier: Apache-2.0
#include "platform/dispatch_pool.h"
#include "tests/src/mac/queued_backend_bench.h"
#include "tests/support/test_effort.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <functional>
#include <iostream>
#include <memory>
#include <random>
#include <thread>
#include <utility>

// Queued back-ends that live a short and busy life and end with captures on their way, while their desktop
// and what is kept out of it change. What must not be seen is pure red, and nothing else has any red.

using namespace platform;

namespace {

constexpr unsigned SEED = 6'561;
constexpr unsigned MAIN = 1;
constexpr unsigned SIDE = 2;
constexpr pid_t KEPT = 5'000'100;
constexpr pid_t HIDDEN = 5'000'200;
constexpr CGWindowID KEPT_WINDOW = 1;
constexpr CGWindowID SECRET_WINDOW = 2;
constexpr CGWindowID PASSING_WINDOW = 3;
constexpr auto PICTURE = SimulatedOperation::TakeWindowPicture;

/// How it is gone about.
struct Way {
    bool tellsWhatIsKeptOut = true;
    bool isOfApplications = false;
};

struct Seen {
    int lives = 0;
    int endedOnTheQueue = 0;
    int notEnded = 0;
    long pictures = 0;
    long leaks = 0;
    long kept = 0; ///< Pixels of the kept window: the share was alive.
};

Scene Desk() {
    return Scene()
        .Display(0, 0, 60, 40)
        .Display(60, 0, 40, 30)
        .App(KEPT, "Kept")
        .Window(KEPT_WINDOW)
        .At(5, 5, 70, 20)
        .Colour(0x0000FF)
        .App(HIDDEN, "Hidden")
        .Window(SECRET_WINDOW)
        .At(20, 10, 60, 15)
        .Colour(0xFF0000)
        .Window(PASSING_WINDOW)
        .Of(KEPT)
        .At(0, 0, 8, 8)
        .Colour(0x00FF00)
        .Pointer(1000, 1000);
}

/// A back-end that tells whether it ended on another thread than the one that made it.
class Mortal final : public ShareCapturerCGSGCD {
public:
    explicit Mortal(std::shared_ptr<std::atomic<int>> endsElsewhere)
        : m_elsewhere(std::move(endsElsewhere)) {}
    ~Mortal() override { *m_elsewhere += std::this_thread::get_id() != m_made ? 1 : 0; }

private:
    const std::thread::id m_made = std::this_thread::get_id();
    const std::shared_ptr<std::atomic<int>> m_elsewhere;
};

/// One back-end from its first tick to its end.
class Life {
public:
    Life(const Way& way, CServedScene& desktop, CManualClockScope& clock, unsigned seed, Seen& seen)
        : m_way(way),
          m_desktop(desktop),
          m_clock(clock),
          m_random(seed),
          m_seen(seen) {}

    void Run() {
        const auto endsElsewhere = std::make_shared<std::atomic<int>>(0);
        m_context = std::make_shared<ShareCapturerContextMac>();
        m_backEnd = std::make_shared<Mortal>(endsElsewhere);
        EXPECT_TRUE(m_backEnd->init(m_context));
        m_context->AddSharedDisplay(MAIN);
        if (m_way.isOfApplications) {
            m_context->AddSharedApp(static_cast<unsigned>(KEPT));
            m_context->AddSharedApp(static_cast<unsigned>(HIDDEN));
        }
        std::atomic<bool> isOver{false};
        std::thread notices([&] { Disturb(*m_backEnd, isOver); });
        for (int i = Between(5, 30); i > 0; --i)
            Step();
        isOver = true;
        notices.join();
        const std::weak_ptr<Mortal> watched = m_backEnd;
        m_backEnd = nullptr; // with captures on their way
        m_desktop->Heal(PICTURE);
        m_clock->Advance(std::chrono::seconds(5));
        platform::RestPool();
        ++m_seen.lives;
        m_seen.notEnded += watched.expired() ? 0 : 1;
        m_seen.endedOnTheQueue += *endsElsewhere;
    }

private:
    int Between(int low, int high) { return std::uniform_int_distribution<int>(low, high)(m_random); }

    /// What comes on a notice thread.
    static void Disturb(ShareCapturerCGSGCD& backEnd, const std::atomic<bool>& isOver) {
        while (!isOver) {
            backEnd.onScreenResolutionChanged(MAIN);
            backEnd.onDisplayPlugin(SIDE);
            std::this_thread::yield();
        }
    }

    void Step() {
        switch (Between(0, 9)) {
            case 0:
                KeepSecret(!m_isKeptOut);
                break;
            case 1:
                m_backEnd->setCaptureDisplay(Between(0, 3) == 0 ? SIDE : MAIN);
                break;
            case 2:
                m_backEnd->setMaxSize(Between(0, 1) == 0 ? TVLSize{30, 20} : TVLSize{1920, 1080});
                break;
            case 3:
                m_desktop->FailNext(PICTURE);
                break;
            case 4:
                m_desktop->MoveWindow(PASSING_WINDOW, {static_cast<float>(Between(0, 50)), 30});
                break;
            default:
                m_desktop->DelayNext(PICTURE, std::chrono::milliseconds(Between(0, 90)));
        }
        m_clock->Advance(std::chrono::milliseconds(Between(0, 9) == 0 ? 501 : Between(5, 40)));
        if (m_backEnd->captureToIShareFrame(m_frame.Get()) == SHARE_CAPTURE_OK)
            Look();
        if (Between(0, 1) == 0)
            std::this_thread::yield();
    }

    void KeepSecret(bool isKeptOut) {
        m_isKeptOut = isKeptOut;
        if (!m_way.tellsWhatIsKeptOut)
            return;
        const auto hidden = static_cast<unsigned>(HIDDEN);
        if (m_way.isOfApplications)
            isKeptOut ? m_context->RemoveSharedApp(hidden) : m_context->AddSharedApp(hidden);
        else
            isKeptOut ? m_context->AddUnSharedApp(hidden) : m_context->RemoveUnSharedApp(hidden);
    }

    void Look() {
        const TVLSize size = SizeOf(*m_frame.Get());
        ++m_seen.pictures;
        for (int y = 0; y < size.cy; ++y) {
            const unsigned char* const row = m_frame.Get()->GetFrameLineData(y);
            for (int x = 0; x < size.cx; ++x) {
                m_seen.leaks += m_isKeptOut && row[x * 4] != 0 ? 1 : 0;
                m_seen.kept += row[x * 4] == 0 && row[x * 4 + 2] == 0xFF ? 1 : 0;
            }
        }
    }

    const Way m_way;
    CServedScene& m_desktop;
    CManualClockScope& m_clock;
    std::mt19937 m_random;
    Seen& m_seen;
    std::shared_ptr<ShareCapturerContext> m_context;
    std::shared_ptr<Mortal> m_backEnd;
    const FrameRef m_frame = NewFrameRef();
    bool m_isKeptOut = false;
};

/// So many lives, and then more until enough was seen: that is a matter of how the threads meet.
Seen RunLives(const Way& way, int lives, const std::function<bool(const Seen&)>& isEnough) {
    CManualClockScope clock;
    const CSettingsScope settings;
    AppShareConfig::Instance()->m_nAppShareBackgroundColor = 0x004000;
    CServedScene desktop(Desk());
    Seen seen;
    const auto deadline = std::chrono::steady_clock::now() + PATIENCE;
    while (seen.lives < lives || (!isEnough(seen) && std::chrono::steady_clock::now() < deadline))
        Life(way, desktop, clock, SEED + static_cast<unsigned>(seen.lives), seen).Run();
    platform::Rest();
    std::cout << seen.lives << " lives from seed " << SEED << " on: " << seen.pictures << " pictures, "
              << seen.endedOnTheQueue << " ends on a thread of the queue, " << seen.leaks << " leaks\n";
    return seen;
}

void EndsEachWithoutALeak(const Way& way, int lives) {
    const auto isEnough = [lives](const Seen& seen) {
        return seen.pictures > lives && seen.kept > 100L * lives && seen.endedOnTheQueue > 0;
    };
    const Seen seen = RunLives(way, lives, isEnough);
    EXPECT_EQ(seen.leaks, 0);
    EXPECT_EQ(seen.notEnded, 0);
    EXPECT_TRUE(isEnough(seen)) << seen.pictures << " pictures, " << seen.kept << " pixels";
}

constexpr int LIVES = 60;

} // namespace

TEST(QueuedBackEndHammer, EndsEachDesktopShareWithoutALeak) {
    EndsEachWithoutALeak({}, TestRounds(LIVES));
}

TEST(QueuedBackEndHammer, EndsEachApplicationShareWithoutALeak) {
    Way way;
    way.isOfApplications = true;
    EndsEachWithoutALeak(way, TestRounds(LIVES));
}

TEST(QueuedBackEndHammer, SeesTheLeakOfAShareThatIsNotToldWhatToKeepOut) {
    Way way;
    way.tellsWhatIsKeptOut = false;
    const auto isSeen = [](const Seen& seen) { return seen.leaks > 0; };
    EXPECT_TRUE(isSeen(RunLives(way, LIVES, isSeen)));
}
