// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/av_foundation_script.h"

#include <screenshare/share_types.h>

#include <memory>
#include <stdexcept>

/// While it lives, no capture session can be started, and it raises what nobody reckons with: there is no
/// back-end in the modes of sessions.
class CNoBackEndScope {
public:
    /// One of those modes.
    static constexpr SCREEN_CAPTURER_TYPE MODE = SCREEN_CAPTURER_TYPE_AVFOUNDATION;

    CNoBackEndScope() : m_former(platform::ReplaceAVCaptureScript(m_script)) {
        constexpr unsigned ATTEMPTS = 200;
        for (unsigned nth = 1; nth <= ATTEMPTS; ++nth)
            m_script->Do(
                platform::AVCaptureOperation::StartRunning, [] { throw std::runtime_error("no session"); },
                nth);
    }
    ~CNoBackEndScope() { platform::ReplaceAVCaptureScript(m_former); }
    CNoBackEndScope(const CNoBackEndScope&) = delete;
    CNoBackEndScope& operator=(const CNoBackEndScope&) = delete;

private:
    const std::shared_ptr<platform::AVCaptureScript> m_script = std::make_shared<platform::AVCaptureScript>();
    const std::shared_ptr<platform::AVCaptureScript> m_former;
};
