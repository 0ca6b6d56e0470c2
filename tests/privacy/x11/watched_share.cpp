// SPDX-License-Identifier: Apache-2.0
#include "tests/privacy/x11/watched_share.h"

#include "platform/core_graphics.h"
#include "platform/window_pins.h"
#include "src/share_capture_engine_impl.h"

#include <stdexcept>
#include <utility>

namespace {

std::shared_ptr<CScreenCaptureTaskThread> WorkerOf(IShareCaptureEngine& engine) {
    struct Reach : CShareCaptureEngine {
        static std::shared_ptr<CScreenCaptureTaskThread> Of(CShareCaptureEngine& other) {
            return (other.*&Reach::_GetWorker)();
        }
    };
    return Reach::Of(dynamic_cast<CShareCaptureEngine&>(engine));
}

unsigned PidOf(const SharedParty& party) {
    return static_cast<unsigned>(party.pid);
}

/// The middle of a pixel of a frame, on the desktop.
platform::CGPoint PlaceOf(int x, int y, const TVLSize& size, const TVLRect& captured) {
    const auto across = static_cast<float>(captured.right - captured.left) / static_cast<float>(size.cx);
    const auto down = static_cast<float>(captured.bottom - captured.top) / static_cast<float>(size.cy);
    return {static_cast<float>(captured.left) + (static_cast<float>(x) + 0.5F) * across,
            static_cast<float>(captured.top) + (static_cast<float>(y) + 0.5F) * down};
}

bool Meets(const platform::CGRect& frame, const TVLRect& rect) {
    return frame.origin.x < static_cast<float>(rect.right) &&
           frame.origin.y < static_cast<float>(rect.bottom) &&
           frame.origin.x + frame.size.width > static_cast<float>(rect.left) &&
           frame.origin.y + frame.size.height > static_cast<float>(rect.top);
}

} // namespace

WatchedShare::WatchedShare(SHARE_CAPTURE_ENGINE_TYPE kind, SCREEN_CAPTURER_TYPE mode, PrivacyFault fault,
                           PrivacyJournal& journal)
    : m_kind(kind),
      m_mode(mode),
      m_fault(fault),
      m_journal(journal),
      m_wantedMode(mode),
      m_engine(CreateShareCaptureEngine(kind)) {
    if (m_engine == nullptr)
        throw std::runtime_error("no engine");
    m_engine->SetCaptureMode(mode);
    m_engine->SetSink(this);
}

WatchedShare::~WatchedShare() {
    m_engine->Stop();
    if (DestroyShareCaptureEngine(m_engine) != 0)
        m_journal.Fail("an engine can't be destroyed");
}

bool WatchedShare::Start() {
    m_hasStarted = m_hasStarted || m_engine->Start() == 0;
    return m_hasStarted;
}

// ---- The mode

void WatchedShare::SetOtherMode(SCREEN_CAPTURER_TYPE mode) {
    m_wantedMode = mode;
    m_engine->SetCaptureMode(mode);
}

void WatchedShare::SetMode() {
    SetOtherMode(m_mode);
}

void WatchedShare::Tend() {
    SHARE_CAPTURE_STATISTIC statistic{};
    m_engine->GetShareCaptureStatistic(statistic);
    if (!m_hasStarted || statistic.eCaptureMode == m_wantedMode ||
        statistic.eCaptureMode != SCREEN_CAPTURER_TYPE_DEFAULT)
        return;
    m_journal.CountFallback(m_wantedMode);
    m_engine->SetCaptureMode(m_wantedMode);
}

// ---- Who may be seen

void WatchedShare::Show(const SharedParty& party) {
    if (m_kind == SHARE_CAPTURE_ENGINE_TYPE_DESKTOP && party.window != 0)
        m_engine->RemoveUnSharedWindow(party.window);
    if (m_kind == SHARE_CAPTURE_ENGINE_TYPE_APP)
        m_engine->AddSharedProcess(PidOf(party));
    if (m_kind == SHARE_CAPTURE_ENGINE_TYPE_WINDOW && party.window != 0)
        m_engine->AddSharedWindow(party.window);
}

void WatchedShare::ShowNoMore(const SharedParty& party) {
    if (m_kind == SHARE_CAPTURE_ENGINE_TYPE_DESKTOP && party.window != 0)
        m_engine->AddUnSharedWindow(party.window);
    if (m_kind == SHARE_CAPTURE_ENGINE_TYPE_APP)
        Must(m_engine->RemoveSharedProcess(PidOf(party)), "RemoveSharedProcess");
    if (m_kind == SHARE_CAPTURE_ENGINE_TYPE_WINDOW && party.window != 0)
        Must(m_engine->RemoveSharedWindow(party.window), "RemoveSharedWindow");
}

/// What it answers with something else isn't promised.
void WatchedShare::Must(int result, const char* operation) {
    if (result != 0)
        m_journal.Fail(std::string(operation) + " of the " + NameOf(m_kind) + " share gives " +
                       std::to_string(result));
}

// ---- Secrets

void WatchedShare::AfterWhatWasTold(std::function<void()> then) {
    const std::shared_ptr<CScreenCaptureTaskThread> worker = WorkerOf(*m_engine);
    const auto task = [then] {
        then();
        return 0U;
    };
    if (worker == nullptr || worker->async(task) != 0)
        then();
}

/// True when that is all that is done.
bool WatchedShare::ForgetsToKeepOut(const SharedParty& secret) {
    if (m_fault != PrivacyFault::Forget)
        return false;
    if (m_kind != SHARE_CAPTURE_ENGINE_TYPE_DESKTOP)
        Show(secret);
    return true;
}

void WatchedShare::Meet(const SharedParty& secret) {
    const bool isNew = m_secrets.emplace(secret.number, Hold::Out).second;
    if (ForgetsToKeepOut(secret) || !isNew || m_kind != SHARE_CAPTURE_ENGINE_TYPE_DESKTOP)
        return;
    ++m_letIn;
    TellOut(secret);
    AfterWhatWasTold([this] { --m_letIn; });
}

void WatchedShare::TellOut(const SharedParty& secret) {
    if (m_fault == PrivacyFault::Forget)
        return;
    if (m_kind == SHARE_CAPTURE_ENGINE_TYPE_DESKTOP)
        Must(m_engine->AddUnSharedProcess(PidOf(secret)), "AddUnSharedProcess");
    else
        ShowNoMore(secret);
}

void WatchedShare::KeepOut(const SharedParty& secret) {
    Hold& hold = m_secrets[secret.number];
    if (hold != Hold::In)
        return;
    hold = Hold::Out;
    TellOut(secret);
    AfterWhatWasTold([this] { --m_letIn; });
}

void WatchedShare::KeepOutByWindow(const SharedParty& secret) {
    Hold& hold = m_secrets[secret.number];
    if (secret.window == 0 || secret.hasPopups || hold == Hold::OutByWindow ||
        m_kind == SHARE_CAPTURE_ENGINE_TYPE_WINDOW || m_fault == PrivacyFault::Forget)
        return;
    const Hold former = std::exchange(hold, Hold::OutByWindow);
    Must(m_engine->AddUnSharedWindow(secret.window), "AddUnSharedWindow");
    if (former == Hold::In)
        AfterWhatWasTold([this] { --m_letIn; });
    else if (m_kind == SHARE_CAPTURE_ENGINE_TYPE_DESKTOP)
        m_engine->RemoveUnSharedProcess(PidOf(secret));
    else
        m_engine->AddSharedProcess(PidOf(secret));
}

void WatchedShare::LetIn(const SharedParty& secret) {
    Hold& hold = m_secrets[secret.number];
    if (secret.window == 0 || hold == Hold::In)
        return;
    ++m_letIn;
    TellIn(secret, std::exchange(hold, Hold::In));
}

void WatchedShare::TellIn(const SharedParty& secret, Hold former) {
    if (former == Hold::OutByWindow)
        m_engine->RemoveUnSharedWindow(secret.window);
    else if (m_kind == SHARE_CAPTURE_ENGINE_TYPE_DESKTOP)
        m_engine->RemoveUnSharedProcess(PidOf(secret));
    else
        Show(secret);
}

bool WatchedShare::IsLetIn(const SharedParty& secret) const {
    const auto found = m_secrets.find(secret.number);
    return found != m_secrets.end() && found->second == Hold::In;
}

// ---- Frames

/// As the pass has seen the windows, or as they are by now.
bool WatchedShare::HasSecretOnScreen(const TVLRect& captured) const {
    const std::shared_ptr<const platform::WindowSnapshot> windows = platform::WindowsForLookUp();
    for (const platform::WindowInfo& info : windows->Windows()) {
        if (info.onScreen && m_journal.IsSecret(info.owner) && Meets(info.frame, captured))
            return true;
    }
    return false;
}

/// The frontmost window there is of somebody who may be seen.
bool WatchedShare::IsShownInFront(const platform::WindowSnapshot& windows,
                                  const platform::CGPoint& place) const {
    for (const platform::WindowInfo& info : windows.Windows()) {
        if (info.onScreen && platform::CGRectContainsPoint(info.frame, place))
            return m_journal.IsShown(info.owner);
    }
    return false;
}

/// Since when the forbidden has been seen: a viewer sees a frame until the next one.
std::chrono::milliseconds WatchedShare::TimeExposure(const PrivacyJournal::Delivery& delivery) {
    const auto now = PrivacyJournal::Clock::now();
    const auto since = m_exposedSince.value_or(now);
    if (!delivery.isJudged || PrivacyJournal::ForbiddenOf(delivery.mode, delivery.seen) == 0) {
        m_exposedSince.reset();
    } else if (!m_exposedSince) {
        m_exposedSince = now;
        m_exposedBy = delivery.mode;
    }
    return std::chrono::duration_cast<std::chrono::milliseconds>(now - since);
}

void WatchedShare::OnCaptureData(IShareFrame* frame, TVLRect&) {
    TVLSize size{};
    frame->GetFrameSize(size);
    SHARE_CAPTURE_STATISTIC statistic{};
    m_engine->GetShareCaptureStatistic(statistic);
    PrivacyJournal::Delivery delivery{m_kind, statistic.eCaptureMode, {}, m_letIn == 0, false};
    delivery.hasSecretOnScreen = HasSecretOnScreen(frame->GetMetaInfo().rectCapture);
    const MarkerPicture picture = MarkerPictureOf(frame->GetFrameData(), size.cx, size.cy,
                                                  frame->GetFrameLineBytes(), frame->GetFrameDataFormat());
    if (picture.pixels == nullptr)
        m_journal.Fail("a frame of another format: " + std::to_string(frame->GetFrameDataFormat()));
    const TVLRect captured = frame->GetMetaInfo().rectCapture;
    const bool isPaintedOver = delivery.mode == SCREEN_CAPTURER_TYPE_AVFOUNDATION ||
                               delivery.mode == SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX;
    const std::shared_ptr<const platform::WindowSnapshot> walked =
        isPaintedOver ? platform::WindowsForLookUp() : nullptr;
    delivery.seen = CountMarkers(picture, [&](int x, int y) {
        return walked != nullptr && IsShownInFront(*walked, PlaceOf(x, y, size, captured));
    });
    m_journal.TakeExposure(m_kind, m_exposedBy, TimeExposure(delivery));
    m_journal.Take(delivery, *frame);
}
