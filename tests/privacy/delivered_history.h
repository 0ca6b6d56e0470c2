// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/simulated/simulated_window_server.h"
#include "tests/privacy/delivered_counts.h"
#include "tests/privacy/delivered_fault.h"
#include "tests/privacy/paced_window_server.h"
#include "tests/privacy/privacy_oracle.h"
#include "tests/privacy/thumbnail_judge.h"
#include "tests/src/mac/avfoundation/session_bench.h"
#include "tests/src/mac/desktop_share_client.h"
#include "tests/src/mac/desktop_share_desk.h"
#include "tests/support/settings_scope.h"

#include <screenshare/share_engine.h>

#include <sys/types.h>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <ostream>
#include <random>
#include <set>
#include <string>
#include <utility>
#include <vector>

/// Random histories of a desktop that is shared with something kept out, and the frames that a client got of
/// them before the privacy oracle.

/// A history goes by its seed alone, but for the moments at which the engine hears of a changed display and
/// the thumbnail thread of a cancelled request.
class DeliveredHistory {
public:
    DeliveredHistory(const DeliveredKind& kind, DeliveredFault fault, unsigned seed);
    ~DeliveredHistory();
    DeliveredHistory(const DeliveredHistory&) = delete;
    DeliveredHistory& operator=(const DeliveredHistory&) = delete;

    /// Changes a few things and lets a frame be taken.
    void Step();

    const DeliveredCounts& Counts() const { return m_counts; }
    /// The same, with what is shown to the end of it.
    DeliveredCounts End();
    /// The last things that were done, a line each, for whoever has to find out what happened.
    std::string LastSteps() const;

private:
    struct App {
        pid_t pid = 0;
        bool isKeptOut = false;
    };
    /// What the client has said of a window itself; without it, its application counts.
    enum class Verdict {
        None,
        Shared,
        KeptOut,
    };
    struct Window {
        platform::CGWindowID id = 0;
        std::size_t app = 0;
        std::uint32_t rgb = 0; ///< Without red, and of no other window.
        Verdict verdict = Verdict::None;
        bool isPopup = false;
        /// All that it was painted with; while it isn't on screen it may be remembered as any of these.
        std::set<std::uint32_t> worn;
        bool isSecretOfServer = false; ///< The window server gives no pixels of it out.
    };

    /// Requests are served in the order of their addresses, so the fence comes last.
    struct ThumbnailRequest {
        ThumbnailRequest(bool isHindered, ThumbnailJudge::During during)
            : judge(isHindered, std::move(during)) {}

        ThumbnailJudge judge;
        ThumbnailJudge fence{true, {}};
    };

    /// The desktop as it is from some moment on.
    struct Taken {
        /// More than one where something changes in the middle of the pass.
        std::vector<PrivacyMoment> moments;
        int step = 0;
        bool isDisturbed = false;
        bool hasPointer = false; ///< Perhaps in the picture.
    };

    int Number(int from, int to) { return std::uniform_int_distribution<int>(from, to)(m_random); }
    bool Chance(int percent) { return Number(1, 100) <= percent; }
    platform::CGRect SomeFrame();
    Window* SomeWindow();

    /// One without red, and not the last one again.
    std::uint32_t NextColour() { return 0x004000U + (++m_colours * 37U & 0x3FFFU); }

    void Tell(const std::string& what) { m_told.push_back(what); }
    /// Something is wrong with what is told, so the answers need not be right.
    void ExpectDone(int result) const;
    std::shared_ptr<platform::WindowServer> ServerOfSessions() const;
    void Prepare();
    void Take(std::chrono::milliseconds time, bool isDisturbed);
    void TakeWithSamples(std::chrono::milliseconds time, bool isDisturbed);
    void LetSamplesCome(std::chrono::milliseconds time);
    void Expect(std::chrono::milliseconds later, bool isDisturbed);
    void NoteMoment(unsigned stamp);
    void TakeUpModeAgain();
    void Change();
    void ChangeWindow();
    void Change(Window& window, int what);
    void ChangeWindowMeanwhile();
    void ChangeApplication();
    void ChangeWhatIsKeptOut();
    void ChangeShare();
    void TakeBackWhatIsNotToLast();
    void ChangeDisplays();

    void Open(std::size_t app, const platform::CGRect& frame, bool isPopup = false);
    void PopUp(std::size_t app);
    void Close(std::size_t window);
    void ClosePopups();
    void Decide(Window& window, Verdict verdict);
    Verdict OtherVerdict(const Window& window);
    void TellVerdict(platform::CGWindowID window, Verdict former, Verdict verdict);
    void KeepOut(App& app, bool isKeptOut);
    void LetOneThrough(std::size_t app);
    void ShowNothing();
    SCREEN_CAPTURER_TYPE OtherMode();
    /// Has the engine know it, unless something is wrong.
    void TellEngine(bool isKeptOut, const std::function<void()>& tell);
    bool MustNotBeSeen(const Window& window) const;
    bool IsKeptOut(const Window& window) const; ///< By the client.
    void Paint(Window& window);
    std::uint32_t PaintOf(const Window& window) const;

    void AskForThumbnails();
    void AskForSome(bool isHindered, ThumbnailJudge::During during, const std::function<void()>& first = {});
    std::vector<unsigned> SomeIds(bool areApplications);
    std::vector<ThumbnailTruth> ThumbnailTruths() const;
    bool AreWindowsAtRest() const;
    ThumbnailJudge::During ChangeOrCancelInside();
    void HinderThumbnails();
    void CancelThumbnails();
    void TakeThumbnails();

    void Disturb(unsigned stamp);
    void DisturbSession();
    void Calm();
    PrivacyMoment Moment() const;
    void Look(IShareFrame& frame);
    void Judge(IShareFrame& frame, DeliveredCounts& counts);
    const Taken* TakenAs(IShareFrame& frame);
    void NoteExposure(bool isExposed);
    bool ShowsAllThatIsKept(const PrivacyFrame& frame) const;
    PrivacyFindings JudgeBest(const PrivacyFrame& frame) const;
    void LookForLife(const PrivacyFrame& frame, DeliveredCounts& counts) const;
    static long CountStrange(const PrivacyMoment& kept, const PrivacyFrame& frame);

    const DeliveredKind m_kind;
    const DeliveredFault m_fault;
    std::mt19937 m_random;
    const bool m_tellsMoments; // captures may then be left out while nothing changes
    CSettingsScope m_settings;
    SimulatedShareDesk m_desk;
    platform::SimulatedWindowServer* const m_server;
    const CSessionScriptScope m_script;
    // Between the desktop and all who ask for it.
    const std::shared_ptr<CPacedWindowServer> m_paced;
    const CWindowServerScope m_serving{m_paced};
    CShareClient m_client{m_kind.engine};

    platform::CGDirectDisplayID m_side = 0;
    bool m_isPlugged = true;
    bool m_wasResized = false;
    bool m_isPaused = false;
    bool m_isInAnotherMode = false;
    std::vector<App> m_apps;
    std::vector<Window> m_windows;
    std::uint32_t m_colours = 0;
    std::vector<std::function<void()>> m_late;
    std::vector<std::function<void()>> m_veryLate;
    std::vector<std::string> m_told;
    int m_step = 0;
    std::unique_ptr<ThumbnailRequest> m_thumbnails; // while one is under way
    std::chrono::nanoseconds m_windowsChanged{0};

    // Of the frames that may be taken, by the timestamps that they will have, and of the one that was sent
    // last: the worker's while it runs.
    std::mutex m_mutex;
    std::map<unsigned, Taken> m_taken;
    Taken m_shown;
    int m_stepOfSecret = 0;
    const IShareFrame* m_lastFrame = nullptr; // only to tell frames apart
    TVLSize m_lastSize{};                     // when it was new
    std::optional<std::chrono::nanoseconds> m_exposedSince;
    DeliveredCounts m_counts;
};
