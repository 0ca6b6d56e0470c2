// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/core_graphics.h"
#include "tests/src/mac/desktop_share_client.h"
#include "tests/support/test_effort.h"
#include "tests/x11/x11_share_desk.h"

#include <sys/types.h>
#include <atomic>
#include <chrono>
#include <functional>
#include <iostream>
#include <mutex>
#include <optional>
#include <string>
#include <utility>
#include <vector>

/// Somebody maps, raises, moves, resizes and closes red windows over and beside a green one that is shared,
/// which itself is resized, unmapped and mapped, and takes its time to paint. Nothing else on the desktop has
/// any red.

struct HammeredShare {
    const char* name;
    SHARE_CAPTURE_ENGINE_TYPE type;
    SCREEN_CAPTURER_TYPE mode;
    bool picom = false;
};

inline void PrintTo(const HammeredShare& share, std::ostream* out) {
    *out << share.name;
}

/// What happens in a beat, and lasts until something else does.
struct HammerBeat {
    int number;
    const char* toHammer;        ///< Null to go on.
    const char* toShared;        ///< Null to leave it alone.
    const char* popup = nullptr; ///< Opened for the length of the beat.
};

struct HammerPlan {
    std::vector<HammerBeat> beats;
    int length = 0; ///< Beats until it begins anew.

    static constexpr const char* REST = "";
};

class X11ShareHammer : public testing::TestWithParam<HammeredShare> {
protected:
    static constexpr unsigned SEED = 20250917;
    static constexpr std::chrono::milliseconds BEAT{100};

    /// `plan` outlives the case.
    explicit X11ShareHammer(const HammerPlan& plan) : m_plan(plan) {}

    void SetUp() override {
        const X11DeskOptions options{
            .server = {.kind = XServerOptions::Kind::Xorg, .width = 640, .height = 480},
            .manager = X11DeskOptions::Manager::Openbox,
            .picom = GetParam().picom};
        if (const auto missing = MissingProgram(options.Programs())) {
            std::cout << *missing << "\n";
            GTEST_SKIP() << *missing;
        }
        m_share.emplace(options);
        m_desk = &dynamic_cast<X11Desk&>(m_share->Desk());
        const unsigned flags = SHARE_CONFIG_FLAG_NO_POINTER; // it might have red
        ASSERT_EQ(ShareConfig(SHARE_CONFIG_FLAG, &flags, sizeof(flags)), 0);
        const auto showing = m_desk->StartApplication("Shown");
        const auto hammering = m_desk->StartApplication("Hammer");
        ASSERT_TRUE(showing && hammering);
        m_shown = *showing;
        m_hammer = *hammering;
        if (GetParam().picom)
            PutBackdrop();
        // Without a background, so that what it gains by growing, or by being mapped, is somebody else's
        // until its application has painted.
        const auto shared = Shown().Create("shared", "40 120 200 150 00ff00 none slow=25");
        ASSERT_TRUE(shared);
        m_shared = *shared;
        m_desk->Settle();
    }

    void TearDown() override { m_client.reset(); } // before what looks at its frames

    // ---- The share

    /// `look` is called for each frame, on the thread of the passes.
    void Prepare(std::function<void(IShareFrame&)> look) {
        constexpr unsigned FPS = 30;
        m_client.emplace(GetParam().type);
        EXPECT_EQ((*m_client)->SetCaptureMode(GetParam().mode), 0);
        (*m_client)->SetCaptureFps(FPS); // not every back-end is offered it, but the engine goes by it
        m_client->sink.SetFrameHook([look = std::move(look)](IShareFrame* frame) { look(*frame); });
        switch (GetParam().type) {
            case SHARE_CAPTURE_ENGINE_TYPE_DESKTOP:
                m_client->ShareMonitor(platform::CGMainDisplayID());
                break;
            case SHARE_CAPTURE_ENGINE_TYPE_APP:
                EXPECT_EQ((*m_client)->AddSharedProcess(static_cast<unsigned>(m_shown)), 0);
                break;
            default:
                EXPECT_EQ((*m_client)->AddSharedWindow(m_shared), 0);
        }
    }
    void KeepHammerOut() {
        if (GetParam().type == SHARE_CAPTURE_ENGINE_TYPE_DESKTOP) {
            EXPECT_EQ((*m_client)->AddUnSharedProcess(static_cast<unsigned>(m_hammer)), 0);
        }
    }
    void Start(const std::function<bool()>& isAlive) {
        m_client->Start();
        ASSERT_TRUE(ComesTrue(isAlive)) << "the share shows nothing";
        PutLid(); // now, since an application is brought forward when it is shared
    }

    // ---- What happens

    template <class Condition>
    void PlayWhile(int firstBeat, Condition goesOn) {
        const auto start = std::chrono::steady_clock::now();
        for (int beat = firstBeat; goesOn(std::chrono::steady_clock::now() - start); ++beat) {
            m_beat = beat;
            ClosePopup();
            for (const HammerBeat& each : m_plan.beats) {
                if (each.number == beat % m_plan.length)
                    Play(each, SEED + static_cast<unsigned>(beat));
            }
            Pass(BEAT);
        }
    }
    /// Lets a beat pass.
    virtual void Pass(std::chrono::milliseconds beat) { m_share->Run(**m_client, beat); }
    void EndPlay() {
        ClosePopup();
        EXPECT_TRUE(Hammer().Tell("calm"));
        EXPECT_EQ((*m_client)->Stop(), 0);
    }
    /// For whoever has to find out when it was.
    int Beat() const { return m_beat; }

    X11Client& Shown() { return *m_desk->Application(m_shown); }
    X11Client& Hammer() { return *m_desk->Application(m_hammer); }

    const CSettingsScope m_settings;
    std::optional<X11ShareDesk> m_share;
    X11Desk* m_desk = nullptr; // of m_share
    std::optional<CShareClient> m_client;
    platform::CGWindowID m_shared = 0;
    platform::CGWindowID m_lid = 0;
    pid_t m_shown = 0;
    pid_t m_hammer = 0;

private:
    /// Behind all, because a compositor shows something grey there.
    void PutBackdrop() {
        const auto backdrop = m_desk->StartApplication("Backdrop");
        ASSERT_TRUE(backdrop);
        X11Client& client = *m_desk->Application(*backdrop);
        ASSERT_TRUE(client.Create("backdrop", "0 0 640 480 000000 override"));
        ASSERT_TRUE(client.Tell("lower backdrop"));
    }
    /// In front of all: it was put there past the window manager.
    void PutLid() {
        const auto lid = Hammer().Create("lid", "140 60 460 280 ff0000 override");
        ASSERT_TRUE(lid);
        m_lid = *lid;
        m_desk->Settle();
    }
    void Play(const HammerBeat& beat, unsigned seed) {
        if (beat.toHammer != nullptr) {
            EXPECT_TRUE(Hammer().Tell("calm"));
            if (*beat.toHammer != '\0') {
                EXPECT_TRUE(Hammer().Tell(HammerLine(beat.toHammer, seed)));
            }
        }
        if (beat.toShared != nullptr) {
            EXPECT_TRUE(Shown().Tell(beat.toShared));
        }
        // Over a single window that is shared it would be one of those that are not.
        if (beat.popup != nullptr && GetParam().type != SHARE_CAPTURE_ENGINE_TYPE_WINDOW) {
            m_hasPopup = Shown().Create("popup", beat.popup).has_value();
            EXPECT_TRUE(m_hasPopup);
        }
    }
    /// `place` may be followed by a pace.
    static std::string HammerLine(const std::string& place, unsigned seed) {
        const std::size_t pace = place.find(" every=");
        return "hammer " + place.substr(0, pace) + " ff0000 " + std::to_string(seed) +
               (pace != std::string::npos ? place.substr(pace) : std::string());
    }
    void ClosePopup() {
        if (m_hasPopup) {
            EXPECT_TRUE(Shown().Tell("destroy popup"));
        }
        m_hasPopup = false;
    }

    const HammerPlan& m_plan;
    std::atomic<int> m_beat{0};
    bool m_hasPopup = false;
};
