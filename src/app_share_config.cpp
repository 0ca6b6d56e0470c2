// SPDX-License-Identifier: Apache-2.0
#include "src/app_share_config.h"

#include "util/cm_clock.h"
#include "util/cm_trusted_file.h"

#include <screenshare/share_types.h>

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <exception>
#include <optional>

namespace {

constexpr const char* CONFIG_DIR = "/tmp/screen_share";
constexpr const char* CONFIG_FILE = "share_config.json";
constexpr const char* DUMP_FOLDER = "/img-dump";

/// Seconds after which a file that was not there is looked for again, and after which a good one is read
/// again.
constexpr std::int64_t LOOK_AGAIN_AFTER = 10;
constexpr std::int64_t READ_AGAIN_AT = 61;

std::string ConfigDir() {
    const char* const dir = std::getenv("SCREENSHARE_DEBUG_DIR");
    return dir != nullptr && *dir != '\0' ? dir : CONFIG_DIR;
}

} // namespace

AppShareConfig* AppShareConfig::Instance() {
    static AppShareConfig instance;
    return &instance;
}

AppShareConfig::AppShareConfig()
    : m_strConfigDir(ConfigDir()),
      m_strDumpPathPrefix(m_strConfigDir + DUMP_FOLDER + "/") {}

// ---- The file

void AppShareConfig::Refresh() {
    // Begins with the first Refresh and not with the first read.
    static std::atomic<std::int64_t> lastRead{CmWallSeconds()};
    std::int64_t last = lastRead;
    const std::int64_t now = CmWallSeconds();
    const std::int64_t elapsed = now - last;
    const bool isDue = (!m_hasConfig && elapsed > LOOK_AGAIN_AFTER) || elapsed >= READ_AGAIN_AT;
    if (isDue && lastRead.compare_exchange_strong(last, now))
        UpdateConfig();
}

void AppShareConfig::UpdateConfig() {
    const std::lock_guard<std::recursive_mutex> lock(m_mutexConfig);
    if (!CheckConfig())
        return;
    ReadSwitch("dump_point_raw_data", m_bDumpPointRawData);
    ReadNumber("dump_raw_data_ring_size", m_nDumpDataRingSize);
    ReadNumber("dump_raw_data_every_x_frames", m_nDumpDataEveryFrames);
    ReadSwitch("dummy_point", m_bDummyPoint);
    ReadSwitch("dummy_capture", m_bDummyCapture);
    ReadNumber("dummy_capture_width", m_nDummyCaptureWidth);
    ReadNumber("dummy_capture_height", m_nDummyCaptureHeight);
    ReadSwitch("dummy_point_sys_pos", m_bDummyPointSysPos);
    ReadSwitch("dummy_enumerator", m_bDummyEnumerator);
    ReadSwitch("capture_resample_enable", m_bCaptureResampleEnable);
    ReadSwitch("capture_resample_fixsize_enable", m_bCaptureResampleFixSizeEnable);
    ReadNumber("capture_resample_width", m_nResampleScreenCaptureWidth);
    ReadNumber("capture_resample_height", m_nResampleScreenCaptureHeight);
    ReadSwitch("EnableWin8MagCapture", m_bWin8EnableMag);
    ReadNumber("trace_one_by_frames", m_nTraceOneByFrames);
    ReadNumber("screen_capturer_type", m_nScreenCapturerType);
}

void AppShareConfig::ReadSwitch(const char* key, ShareRelaxed<bool>& setting) {
    bool value = false;
    if (GetConfigBool(key, value))
        setting = value;
}

void AppShareConfig::ReadNumber(const char* key, ShareRelaxed<int>& setting) {
    int value = 0;
    if (GetConfigInt(key, value))
        setting = value;
}

bool AppShareConfig::CheckConfig() {
    const std::optional<std::string> text = CmReadTrustedFile(m_strConfigDir, CONFIG_FILE);
    return text && CheckConfig(text->c_str());
}

bool AppShareConfig::CheckConfig(const char* text) {
    try {
        const json::Value config = json::Deserialize(text);
        if (config.GetType() == json::NULLVal)
            return false;
        const std::lock_guard<std::recursive_mutex> lock(m_mutexConfig);
        m_config = config;
        m_hasConfig = true;
        return true;
    } catch (const std::exception&) {
        return false;
    }
}

void AppShareConfig::ClearConfig() {
    const std::lock_guard<std::recursive_mutex> lock(m_mutexConfig);
    m_config.Clear();
    m_hasConfig = false;
}

bool AppShareConfig::GetConfigValue(const std::string& key, json::Value& out) {
    const std::lock_guard<std::recursive_mutex> lock(m_mutexConfig);
    if (m_config.GetType() != json::ObjectVal || !m_config.HasKey(key))
        return false;
    out = m_config[key];
    return true;
}

bool AppShareConfig::GetConfigBool(const std::string& key, bool& out) {
    json::Value value;
    if (!GetConfigValue(key, value) || value.GetType() != json::BoolVal)
        return false;
    out = value.ToBool();
    return true;
}

bool AppShareConfig::GetConfigInt(const std::string& key, int& out) {
    json::Value value;
    if (!GetConfigValue(key, value) || value.GetType() != json::IntVal)
        return false;
    out = value;
    return true;
}

bool AppShareConfig::GetConfigDouble(const std::string& key, double& out) {
    json::Value value;
    if (!GetConfigValue(key, value) || value.GetType() != json::DoubleVal)
        return false;
    out = value;
    return true;
}

bool AppShareConfig::GetConfigString(const std::string& key, std::string& out) {
    json::Value value;
    if (!GetConfigValue(key, value) || value.GetType() != json::StringVal)
        return false;
    out = value.ToString();
    return true;
}

// ---- Settings

bool AppShareConfig::IsDummyPointEnabled() {
    Refresh();
    return m_bDummyPoint;
}

bool AppShareConfig::IsDummySourceEnabled() {
    Refresh();
    return m_bDummyEnumerator;
}

bool AppShareConfig::IsDummyPointSysPosEnabled() {
    Refresh();
    return m_bDummyPointSysPos;
}

bool AppShareConfig::IsDummyCaptureEnabled() {
    Refresh();
    return m_bDummyCapture || (m_nShareConfigFlags & SHARE_CONFIG_FLAG_DUMMY_CAPTURE) != 0;
}

int AppShareConfig::GetDummyCaptureWidth() {
    Refresh();
    return std::max<int>(m_nDummyCaptureWidth, 1);
}

int AppShareConfig::GetDummyCaptureHeight() {
    Refresh();
    return std::max<int>(m_nDummyCaptureHeight, 1);
}

bool AppShareConfig::IsCaptureDumpPointDataEnabled() {
    Refresh();
    return m_bDumpPointRawData;
}

int AppShareConfig::GetDumpDataRingSize() {
    Refresh();
    return std::max<int>(m_nDumpDataRingSize, 1);
}

int AppShareConfig::GetDumpDataEveryFrames() {
    Refresh();
    return std::max<int>(m_nDumpDataEveryFrames, 1);
}

bool AppShareConfig::IsWin8EnableMag() {
    Refresh();
    return m_bWin8EnableMag;
}

int AppShareConfig::GetFrameTraceFrequency() {
    Refresh();
    return std::max<int>(m_nTraceOneByFrames, 1);
}

std::string AppShareConfig::GetCaptureDumpPathNamePrefix() {
    const int ringSize = std::max<int>(m_nDumpDataRingSize, 1);
    Refresh();
    int index = m_nIndexFile.load();
    int used = 0;
    do {
        used = index > ringSize ? 0 : index;
    } while (!m_nIndexFile.compare_exchange_weak(index, used + 1));
    return m_strDumpPathPrefix + std::to_string(used);
}

bool AppShareConfig::IsDumpFolderTrusted() const {
    return CmIsTrustedFolder(m_strConfigDir) && CmIsTrustedFolder(m_strConfigDir + DUMP_FOLDER);
}

float AppShareConfig::GetCurrentScale() const {
    const float scale = m_fCurrentScale;
    return scale > 0.1F ? scale : 0.1F;
}

int AppShareConfig::GetResampleScreenCaptureWidth() const {
    return std::max<int>(m_nResampleScreenCaptureWidth, 800);
}

int AppShareConfig::GetResampleScreenCaptureHeight() const {
    return std::max<int>(m_nResampleScreenCaptureHeight, 600);
}

void AppShareConfig::SetCurrentScale(float scale) {
    if (scale > 0)
        m_fCurrentScale = scale;
}

void AppShareConfig::SetMagCapturerMaxExcludeWindowCount(int count) {
    m_nMagCapturerMaxExcludeWindowCount = count > 0 ? count : 12;
}
