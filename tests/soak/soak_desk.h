// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/soak/soak_options.h"
#include "tests/x11/x11_client_driver.h"
#include "tests/x11/x11_rig.h"

#include <array>
#include <atomic>
#include <chrono>
#include <memory>
#include <mutex>
#include <random>
#include <string>
#include <vector>

/// What there is to be shared and to be kept out at some moment; a window of it may be gone by now.
struct SoakScene {
    unsigned shown = 0; ///< The application that is shared, and its window on each monitor.
    std::array<unsigned, 2> shownWindows{};
    unsigned guest = 0; ///< Another one, sometimes shared, with its window.
    unsigned guestWindow = 0;
    unsigned stranger = 0; ///< The one whose windows come and go.
    std::vector<unsigned> strangersWindows;
};

/// A desktop of two monitors on an X server of its own. What is shared always changes its colour faster than
/// it is captured. Lively and calm times take turns: in lively ones it also changes its place, an application
/// opens, moves, covers and closes windows, and another one comes and goes; in calm ones windows stand still.
/// Shares that keep something out hold frames back while windows move, so either alone would leave out much.
/// Threads: one, but for Scene and IsCalm, which are for any.
class SoakDesk {
public:
    /// Throws when it can't be had.
    explicit SoakDesk(const SoakOptions& options);

    /// What has to be installed.
    static std::vector<std::string> Programs();

    const XServer& Server() const { return m_server; }
    SoakScene Scene() const;
    /// Whether windows have stood still for so long that nothing is held back for their sake any more.
    bool IsCalm() const { return m_isCalm; }

    /// Does what has fallen due. To be called again and again.
    void Step();
    /// How often somebody came.
    unsigned Visits() const { return m_visits; }
    /// Sends away who comes and goes.
    void Rest() { m_visitor.reset(); }

private:
    using Clock = std::chrono::steady_clock;

    /// Whether it is time, once every `period`.
    struct Due {
        std::chrono::milliseconds period;
        Clock::time_point next = Clock::now() + period;

        bool Comes();
        /// That long from now on.
        void Begin() { next = Clock::now() + period; }
    };

    void SplitScreen() const;
    void OpenWindows();
    void Turn();
    void Paint();
    void MoveShown();
    void Visit();
    void Stir();
    void Open();
    void Close();
    void Tell(X11Client& application, const std::string& line) const;
    unsigned Create(X11Client& application, const std::string& name, const std::string& rest) const;
    int Random(int below) { return static_cast<int>(m_random() % static_cast<unsigned>(below)); }
    std::string AnyPlace();
    std::string PlaceText(int x, int y, int width, int height) const;

    const int m_width;
    const int m_height;
    std::minstd_rand m_random;
    XServer m_server;
    X11Client m_shown;
    X11Client m_guest;
    X11Client m_stranger;
    std::unique_ptr<X11Client> m_visitor;
    Due m_turn{std::chrono::seconds(10)};
    Due m_settle{std::chrono::seconds(2)};
    Due m_paint{std::chrono::milliseconds(15)};
    Due m_stir{std::chrono::milliseconds(250)};
    Due m_move{std::chrono::seconds(4)};
    Due m_visit{std::chrono::seconds(3)};
    bool m_isLively = true;
    std::atomic<bool> m_isCalm{false};
    unsigned m_paints = 0;
    unsigned m_opened = 0;
    unsigned m_visits = 0;

    struct Window {
        std::string name;
        unsigned id = 0;
    };
    std::vector<Window> m_windows; // the stranger's

    mutable std::mutex m_mutex;
    SoakScene m_scene; // guarded by m_mutex
};
