// SPDX-License-Identifier: Apache-2.0
#include "tests/soak/soak_share.h"

int SoakShare::Create() {
    m_engine = CreateShareCaptureEngine(m_plan.type);
    return m_engine != nullptr ? SHARE_RESULT_OK : SHARE_RESULT_FAILED;
}

int SoakShare::Prepare(unsigned display) {
    if (m_engine == nullptr)
        return SHARE_RESULT_FAILED;
    int result = m_engine->SetCaptureMode(m_plan.mode);
    if (result != SHARE_RESULT_OK)
        return result;
    const SoakScene scene = m_desk.Scene();
    if (m_plan.type == SHARE_CAPTURE_ENGINE_TYPE_DESKTOP)
        result = m_engine->SelectSharedDisplay(display);
    else if (m_plan.type == SHARE_CAPTURE_ENGINE_TYPE_APP)
        result = m_engine->AddSharedProcess(scene.shown);
    else
        result = m_engine->AddSharedWindow(scene.shownWindows[m_plan.monitor]);
    if (result != SHARE_RESULT_OK)
        return result;
    m_engine->SetCaptureFps(m_framesPerSecond); // not every way of capturing takes it, but the engine does
    return m_engine->SetSink(this);
}

int SoakShare::Start() {
    Interrupt();
    return m_engine != nullptr ? m_engine->Start() : SHARE_RESULT_FAILED;
}

int SoakShare::Destroy() {
    if (m_engine == nullptr)
        return SHARE_RESULT_OK;
    const int result = DestroyShareCaptureEngine(m_engine);
    m_engine = nullptr;
    return result;
}

void SoakShare::OnCaptureData(IShareFrame* frame, TVLRect&) {
    const auto now = Clock::now().time_since_epoch();
    const Clock::duration last(m_lastFrame.exchange(now.count()));
    const bool isCalm = m_desk.IsCalm();
    const bool wasCalm = m_wasCalm.exchange(isCalm);
    if (frame->GetFrameDataLen() > 0)
        m_hasShown = true;
    if (!m_counts)
        return;
    ++m_frames;
    const auto period = std::chrono::nanoseconds(std::chrono::seconds(1)) / m_framesPerSecond;
    if (last.count() != 0)
        (isCalm && wasCalm ? m_calmJitter : m_livelyJitter)
            .Add(std::chrono::abs(std::chrono::nanoseconds(now - last) - period));
}
