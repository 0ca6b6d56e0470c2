// SPDX-License-Identifier: Apache-2.0
#include "tests/support/fake_pointing.h"

int CFakePointing::Start() {
    m_calls.Add("pointing Start");
    return SHARE_RESULT_OK;
}

int CFakePointing::Stop() {
    m_calls.Add("pointing Stop");
    return SHARE_RESULT_OK;
}

int CFakePointing::CapturePoint(SHARE_FRAME_FORMAT) {
    m_calls.Add("CapturePoint without scale");
    return SHARE_RESULT_OK;
}

int CFakePointing::CapturePoint(SHARE_FRAME_FORMAT format, float scale) {
    m_calls.Add("CapturePoint");
    polledFormat = format;
    polledScale = scale;
    if (result == SHARE_RESULT_OK && m_sink != nullptr) {
        m_sink->OnPointingPosChanged(x, y);
        m_sink->OnPointingImgChanged(image);
    }
    return result;
}

int CFakePointing::AddSink(ISharePointingSink* sink) {
    m_calls.Add("pointing AddSink");
    m_sink = sink;
    return SHARE_RESULT_OK;
}

int CFakePointing::RemoveSink(ISharePointingSink* sink) {
    m_calls.Add("pointing RemoveSink");
    if (m_sink == sink)
        m_sink = nullptr;
    return SHARE_RESULT_OK;
}

int CFakePointing::CleanSink() {
    m_sink = nullptr;
    return SHARE_RESULT_OK;
}

int CFakePointing::SetBaseDisplayID(unsigned display) {
    m_calls.Add("SetBaseDisplayID");
    baseDisplay = display;
    return SHARE_RESULT_OK;
}
