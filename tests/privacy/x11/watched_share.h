// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"
#include "tests/privacy/x11/privacy_journal.h"

#include <screenshare/share_engine.h>

#include <sys/types.h>

#include <atomic>
#include <chrono>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>

/// Who is to be seen in a share, or not.
struct SharedParty {
    int number = 0; ///< No other of the run has it.
    pid_t pid = 0;
    std::uint32_t window = 0; ///< 0 as long as there is none.
    bool hasPopups = false;   ///< Of windows that aren't its `window`.
};

/// What the client of the library forgets on purpose, to show that it would be noticed.
enum class PrivacyFault {
    None,
    Forget, ///< To keep secrets out.
};

/// A share whose every frame is judged: nobody who is kept out may be in one that is handed over after the
/// worker was told of it. Those that are let in for a while are not told apart from the others, so as long as
/// there is one, nothing is judged.
/// Threads: one, but for what the engine calls.
class WatchedShare final : private IShareCaptureEngineSink {
public:
    WatchedShare(SHARE_CAPTURE_ENGINE_TYPE kind, SCREEN_CAPTURER_TYPE mode, PrivacyFault fault,
                 PrivacyJournal& journal);
    ~WatchedShare();
    WatchedShare(const WatchedShare&) = delete;
    WatchedShare& operator=(const WatchedShare&) = delete;

    SHARE_CAPTURE_ENGINE_TYPE Kind() const { return m_kind; }
    IShareCaptureEngine& Engine() { return *m_engine; }
    bool Start();
    bool HasStarted() const { return m_hasStarted; }
    /// For a while; SetMode() goes back.
    void SetOtherMode(SCREEN_CAPTURER_TYPE mode);
    void SetMode();
    /// The engine gives up a mode that shows nothing for seconds. Here it gets it back.
    void Tend();

    /// Somebody who may be seen: once it has a window, and before or after that has gone.
    void Show(const SharedParty& party);
    void ShowNoMore(const SharedParty& party);

    /// A secret: as soon as it has a process, and again when it has got its window.
    void Meet(const SharedParty& secret);
    void KeepOut(const SharedParty& secret);
    /// Another way to the same end, where there is one.
    void KeepOutByWindow(const SharedParty& secret);
    void LetIn(const SharedParty& secret);
    bool IsLetIn(const SharedParty& secret) const;

private:
    enum class Hold {
        Out,
        OutByWindow,
        In
    };

    void OnCaptureDisplaySizeChanged(TVLSize) override {}
    void OnCapturedWindowListChanged(const unsigned*, int) override {}
    void OnCaptureStatusChanged(int) override {}
    void OnCaptureData(IShareFrame* frame, TVLRect&) override;
    void OnCaptureError(int) override {}
    void OnCapturePositionChanged(int, int, int, int) override {}
    void OnCaptureEvent(int, int, void*) override {}

    void Must(int result, const char* operation);
    bool ForgetsToKeepOut(const SharedParty& secret);
    void TellOut(const SharedParty& secret);
    void TellIn(const SharedParty& secret, Hold former);
    /// The worker has done what it was told until now, or does nothing any more.
    void AfterWhatWasTold(std::function<void()> then);
    std::chrono::milliseconds TimeExposure(const PrivacyJournal::Delivery& delivery);
    bool IsShownInFront(const platform::WindowSnapshot& windows, const platform::CGPoint& place) const;
    bool HasSecretOnScreen(const TVLRect& captured) const;

    const SHARE_CAPTURE_ENGINE_TYPE m_kind;
    const SCREEN_CAPTURER_TYPE m_mode;
    const PrivacyFault m_fault;
    PrivacyJournal& m_journal;
    SCREEN_CAPTURER_TYPE m_wantedMode;
    bool m_hasStarted = false;
    std::map<int, Hold> m_secrets; // by number
    std::atomic<int> m_letIn{0};
    // Of the worker.
    std::optional<PrivacyJournal::Clock::time_point> m_exposedSince;
    SCREEN_CAPTURER_TYPE m_exposedBy = SCREEN_CAPTURER_TYPE_DEFAULT;
    IShareCaptureEngine* const m_engine;
};
