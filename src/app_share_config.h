// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "json/json.h"
#include "src/share_atomic.h"

#include <atomic>
#include <mutex>
#include <string>

/// The settings that belong to the process and not to an engine: debug switches from a JSON file, what the
/// exported functions set, and what capture code publishes for others.
///
/// The file is optional: "/tmp/screen_share/share_config.json", or the one in the folder that the environment
/// variable SCREENSHARE_DEBUG_DIR names. It is read when an engine is made, and again from the getters that
/// say so: every eleven seconds while there is no good file, every 61 seconds after that. A key that is
/// absent or of the wrong type leaves its setting as it is. docs/configuration.md tells every key.
///
/// Threads: any. Each setting is one value, read and written without a lock; the document has a lock of its
/// own. Errors:  nothing is reported. A file that can't be trusted, read or understood leaves everything as
/// it is.
class AppShareConfig {
public:
    static AppShareConfig* Instance();

    AppShareConfig(const AppShareConfig&) = delete;
    AppShareConfig& operator=(const AppShareConfig&) = delete;

    // ---- The file

    /// Reads the file now.
    void InitConfig() { UpdateConfig(); }
    /// Reads the file if it is time to.
    void Refresh();
    /// Reads the file and takes the settings over from it.
    void UpdateConfig();
    /// Reads and parses the file; false leaves the document as it was.
    bool CheckConfig();
    /// Parses a text up to its first zero byte; false leaves the document as it was.
    bool CheckConfig(const char* text);
    /// Forgets the document, not the settings.
    void ClearConfig();

    // Readers of the document: false, and `out` as it was, unless the key holds exactly that type.
    bool GetConfigBool(const std::string& key, bool& out);
    bool GetConfigInt(const std::string& key, int& out);
    bool GetConfigDouble(const std::string& key, double& out);
    bool GetConfigString(const std::string& key, std::string& out);
    bool GetConfigValue(const std::string& key, json::Value& out);

    // ---- Settings, after a Refresh

    bool IsDummyPointEnabled();
    bool IsDummySourceEnabled();
    bool IsDummyPointSysPosEnabled();
    bool IsDummyCaptureEnabled();
    int GetDummyCaptureWidth();
    int GetDummyCaptureHeight();
    bool IsCaptureDumpPointDataEnabled();
    int GetDumpDataRingSize();
    int GetDumpDataEveryFrames();
    bool IsWin8EnableMag();
    int GetFrameTraceFrequency();
    /// Start of the next dump file's name: the dump folder and a number that goes round from 0 to the ring
    /// size. A new ring size takes effect one call later. Nobody makes the folder.
    std::string GetCaptureDumpPathNamePrefix();
    /// Whether what is dumped stays with the user: nobody else can have laid a link there or owns the folder.
    bool IsDumpFolderTrusted() const;

    // ---- Settings as they stand

    bool IsCaptureDumpDataEnabled() const { return m_bCaptureDumpData; }
    /// Frame pixels per point, at least 0.1.
    float GetCurrentScale() const;
    int GetResampleScreenCaptureWidth() const;
    int GetResampleScreenCaptureHeight() const;
    int GetScreenCapturerType() const { return m_nScreenCapturerType; }

    void SetDummyPointEnabled(bool enable) { m_bDummyPoint = enable; }
    /// Values of 0 or less are ignored.
    void SetCurrentScale(float scale);
    /// 0 or less means the default, 12.
    void SetMagCapturerMaxExcludeWindowCount(int count);

    // From the file; the getters clamp, the stored values stay as the file gave them.
    ShareRelaxed<bool> m_bDumpPointRawData{false};
    ShareRelaxed<int> m_nDumpDataRingSize{100};
    ShareRelaxed<int> m_nDumpDataEveryFrames{10};
    ShareRelaxed<bool> m_bDummyPoint{false};
    ShareRelaxed<bool> m_bDummyCapture{false};
    ShareRelaxed<int> m_nDummyCaptureWidth{1024};
    ShareRelaxed<int> m_nDummyCaptureHeight{768};
    ShareRelaxed<bool> m_bDummyPointSysPos{false};
    ShareRelaxed<bool> m_bDummyEnumerator{false};
    ShareRelaxed<bool> m_bCaptureResampleEnable{true};
    ShareRelaxed<bool> m_bCaptureResampleFixSizeEnable{false};
    ShareRelaxed<int> m_nResampleScreenCaptureWidth{1920};
    ShareRelaxed<int> m_nResampleScreenCaptureHeight{1080};
    ShareRelaxed<bool> m_bWin8EnableMag{false};
    ShareRelaxed<int> m_nTraceOneByFrames{100};
    ShareRelaxed<int> m_nScreenCapturerType{1};

    // From calls.
    ShareRelaxed<bool> m_bCaptureDumpData{false};
    ShareRelaxed<float> m_fCurrentScale{1.0F};
    ShareRelaxed<bool> m_bEnableMagCatchException{true};
    ShareRelaxed<int> m_nShareContentType{0};
    ShareRelaxed<int> m_nAppShareBackgroundColor{0x9e9e}; // 0xRRGGBB: teal
    ShareRelaxed<int> m_nOverlapFillColor{0x9e9e};
    ShareRelaxed<int> m_nMagCapturerMaxExcludeWindowCount{12};
    ShareRelaxed<bool> m_bChangeAeroMode{true};
    ShareRelaxed<bool> m_bRecreateCapturer{false};
    ShareRelaxed<bool> m_bDisableSystemAnimation{false};
    ShareRelaxed<bool> m_bAppDisplayByWindow{true};
    ShareRelaxed<bool> m_bEnableIpcScreenCapturer{false};
    ShareRelaxed<unsigned> m_nShareConfigFlags{0};

private:
    AppShareConfig();

    void ReadSwitch(const char* key, ShareRelaxed<bool>& setting);
    void ReadNumber(const char* key, ShareRelaxed<int>& setting);

    const std::string m_strConfigDir;
    const std::string m_strDumpPathPrefix;

    std::recursive_mutex m_mutexConfig;
    json::Value m_config;                 // guarded by m_mutexConfig
    std::atomic<bool> m_hasConfig{false}; // whether m_config is more than null

    std::atomic<int> m_nIndexFile{0};
};
