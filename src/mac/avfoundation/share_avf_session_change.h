// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/av_foundation.h"

/// What changes in a session meanwhile comes into force at the end, as a whole.
class ShareAVFSessionChange {
public:
    explicit ShareAVFSessionChange(platform::AVCaptureSession& session) : m_session(session) {
        m_session.beginConfiguration();
    }
    ~ShareAVFSessionChange() { m_session.commitConfiguration(); }
    ShareAVFSessionChange(const ShareAVFSessionChange&) = delete;
    ShareAVFSessionChange& operator=(const ShareAVFSessionChange&) = delete;

private:
    platform::AVCaptureSession& m_session;
};
