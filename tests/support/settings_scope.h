// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/app_share_config.h"

/// Puts the settings of the process that walks and captures read back to their defaults, before and after a
/// test.
class CSettingsScope {
public:
    CSettingsScope() { Reset(); }
    ~CSettingsScope() { Reset(); }
    CSettingsScope(const CSettingsScope&) = delete;
    CSettingsScope& operator=(const CSettingsScope&) = delete;

    AppShareConfig* operator->() const { return AppShareConfig::Instance(); }

private:
    static void Reset() {
        AppShareConfig& config = *AppShareConfig::Instance();
        config.m_nShareConfigFlags = 0;
        config.m_bCaptureResampleEnable = true;
        config.m_bCaptureResampleFixSizeEnable = false;
        config.m_nResampleScreenCaptureWidth = 1920;
        config.m_nResampleScreenCaptureHeight = 1080;
        config.m_nAppShareBackgroundColor = 0x9e9e;
        config.m_nOverlapFillColor = 0x9e9e;
        config.m_nScreenCapturerType = 1;
        config.m_bAppDisplayByWindow = true;
        config.m_fCurrentScale = 1.0F;
    }
};
