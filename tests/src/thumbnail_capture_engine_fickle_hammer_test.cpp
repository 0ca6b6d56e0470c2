// SPDX-License-Identifier: Apache-2.0
#include "src/thumbnail_capture_engine.h"

#include "src/mac/thumbnail_capturer_mac.h"
#include "tests/src/mac/backend_tools.h"
#include "tests/support/give_way.h"
#include "tests/support/test_effort.h"
#include "tests/support/threads.h"

#include <gtest/gtest.h>

#include <atomic>
#include <functional>
#include <iostream>
#include <memory>
#include <random>
#include <thread>
#include <utility>
#include <vector>

// Callbacks that interfere with their own requests from inside a call, over and over, with slow captures of a
// desktop and somebody else who asks and cancels all the time.

namespace {

constexpr unsigned SEED = 20262;

/// What became of a request; it outlives the callback.
struct Fate {
    std::atomic<bool> isOver{false}; ///< Nothing may come any more.
    std::atomic<int> calls{0};
    std::atomic<int> failures{0};
    std::atomic<int> lasts{0};
    std::atomic<int> lateCalls{0};
    CTally ended;
};

/// Does something at its second call.
class CFickleCallback final : public ThumbnailCallback {
public:
    /// It may end the callback.
    using Deed = std::function<void(CFickleCallback& self, Fate& fate)>;

    CFickleCallback(Fate& fate, Deed deed) : m_fate(fate), m_deed(std::move(deed)) {}

    bool onAppThumbnail(unsigned, ImageData, bool, bool) override { return false; }
    bool onThumbnailError(int) override { return false; }
    bool onWindowThumbnail(unsigned, ImageData, bool failed, bool last) override {
        Fate& fate = m_fate;
        if (fate.isOver) {
            ++fate.lateCalls;
            return true;
        }
        fate.failures += failed ? 1 : 0;
        fate.lasts += last ? 1 : 0;
        fate.isOver = last;
        if (++fate.calls == 2) {
            const Deed deed = m_deed;
            deed(*this, fate);
        }
        if (last)
            fate.ended.Add();
        return true;
    }

private:
    Fate& m_fate;
    const Deed m_deed;
};

class CSlowCapturer final : public CThumbnailCapturerMac {
public:
    bool captureWindowImage(unsigned window, ImageData& image) override {
        GiveWay(m_random() % 60);
        return CThumbnailCapturerMac::captureWindowImage(window, image);
    }

private:
    std::mt19937 m_random{SEED};
};

class CSlowEngine final : public CThumbnailCaptureEngine {
public:
    ~CSlowEngine() override { stop(); }

    bool Request(const std::vector<unsigned>& windows, ThumbnailCallback& callback) {
        return requestForWindows(windows.data(), static_cast<int>(windows.size()), &callback);
    }

private:
    std::unique_ptr<CThumbnailCapturer> NewCapturer() override { return std::make_unique<CSlowCapturer>(); }
};

platform::Scene FourWindows() {
    platform::Scene scene;
    scene.Display(0, 0, 100, 100).App(5'000'100, "Editor");
    for (unsigned window = 1; window <= 4; ++window)
        scene.Window(window).At(0, 0, 8, 8);
    return scene;
}

/// Asks and cancels, whatever happens to others.
class CRival {
public:
    explicit CRival(CSlowEngine& engine)
        : m_thread([this, &engine] {
              while (!m_isDone) {
                  Fate fate;
                  CFickleCallback callback(fate, [](CFickleCallback&, Fate&) {});
                  engine.Request({4, 3}, callback);
                  std::this_thread::yield();
                  engine.cancel(&callback);
              }
          }) {}
    ~CRival() {
        m_isDone = true;
        m_thread.join();
    }
    CRival(const CRival&) = delete;
    CRival& operator=(const CRival&) = delete;

private:
    std::atomic<bool> m_isDone{false};
    std::thread m_thread;
};

class ThumbnailFickleHammer : public testing::Test {
protected:
    /// Each round has windows 1 to 4 and asks for them in that order.
    void Play(const std::function<CFickleCallback::Deed(int round)>& deedOf, bool endsItself,
              const std::function<void(const Fate&, int round)>& check) {
        const int rounds = TestRounds(1000);
        std::vector<std::unique_ptr<Fate>> fates;
        {
            const CRival rival(engine);
            for (int round = 0; round < rounds; ++round) {
                desk->Show(FourWindows().Build());
                fates.push_back(std::make_unique<Fate>());
                auto callback = std::make_unique<CFickleCallback>(*fates.back(), deedOf(round));
                ASSERT_TRUE(engine.Request({1, 2, 3, 4}, *callback));
                if (endsItself)
                    (void)callback.release();
                ASSERT_TRUE(fates.back()->ended.Reaches(1)) << "round " << round;
                engine.cancel(callback.get());
            }
        }
        engine.stop();
        int lateCalls = 0;
        for (int round = 0; round < rounds; ++round) {
            const Fate& fate = *fates[static_cast<std::size_t>(round)];
            lateCalls += fate.lateCalls;
            check(fate, round);
        }
        EXPECT_EQ(lateCalls, 0);
        std::cout << rounds << " rounds, seed " << SEED << "\n";
    }

    const CServedScene desk{FourWindows()};
    CSlowEngine engine;
};

} // namespace

TEST_F(ThumbnailFickleHammer, HearsNothingMoreOnceItHasCancelledAndDestroyedItself) {
    const auto deed = [this](CFickleCallback& self, Fate& fate) {
        engine.cancel(&self);
        fate.isOver = true;
        delete &self;
        fate.ended.Add();
    };
    Play([&](int) { return deed; }, true,
         [](const Fate& fate, int round) {
             EXPECT_EQ(fate.calls, 2) << round;
             EXPECT_EQ(fate.lasts, 0) << round;
         });
}

TEST_F(ThumbnailFickleHammer, HearsOfItsNewRequestOnlyOnceItHasAskedAnew) {
    const auto deedOf = [this](int round) {
        return [this, round](CFickleCallback& self, Fate&) {
            if (round % 2 == 1)
                engine.cancel(&self);
            EXPECT_TRUE(engine.Request({3, 77, 4}, self));
        };
    };
    Play(deedOf, false, [](const Fate& fate, int round) {
        EXPECT_EQ(fate.calls, 2 + 3) << round;
        EXPECT_EQ(fate.failures, 1) << round;
        EXPECT_EQ(fate.lasts, 1) << round;
    });
}

TEST_F(ThumbnailFickleHammer, HearsOfAFailureWhenAWindowToComeIsDestroyed) {
    const auto deedOf = [this](int round) {
        const unsigned window = 3 + static_cast<unsigned>(round) % 2;
        return [this, window](CFickleCallback&, Fate&) { EXPECT_TRUE(desk->CloseWindow(window)); };
    };
    Play(deedOf, false, [](const Fate& fate, int round) {
        EXPECT_EQ(fate.calls, 4) << round;
        EXPECT_EQ(fate.failures, 1) << round;
        EXPECT_EQ(fate.lasts, 1) << round;
    });
}
