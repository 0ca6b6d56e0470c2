// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_capturer.h>
#include <screenshare/share_frame.h>
#include <screenshare/share_types.h>

enum SHARE_CAPTURE_ENGINE_TYPE : int {
    SHARE_CAPTURE_ENGINE_TYPE_USER_CUSTOMIZATION = 1, ///< Fed by the client's own capturer.
    SHARE_CAPTURE_ENGINE_TYPE_DESKTOP = 2,
    SHARE_CAPTURE_ENGINE_TYPE_APP = 3,
    SHARE_CAPTURE_ENGINE_TYPE_WINDOW = 4,
};

enum SHARE_CAPTURE_ENGINE_STATUS : int {
    SHARE_CAPTURE_ENGINE_STATUS_STARTED = 1,
    SHARE_CAPTURE_ENGINE_STATUS_STOPPED = 2,
    SHARE_CAPTURE_ENGINE_STATUS_PAUSED = 3,
};

/// Event types of IShareCaptureEngineSink::OnCaptureEvent.
enum SHARE_CAPTURE_EVENT : int {
    SHARE_CAPTURE_EVENT_APPS_CROSS_MONITORS =
        1, ///< value: 1 when shared windows lie on several monitors, else 0.
    SHARE_CAPTURE_EVENT_CONTENT_UNAVAILABLE =
        1001, ///< value: SHARE_CAPTURE_NO_DATA or SHARE_CAPTURE_DRAGGING.
};

/// Switches of IShareCaptureEngine::Config, with the type of their data.
enum SHARE_CAPTURE_ENGINE_CONFIG : int {
    SHARE_CAPTURE_ENGINE_CONFIG_CHECK_DUP_FRAME = 1, ///< bool: hold back frames equal to the one before.
    SHARE_CAPTURE_ENGINE_CONFIG_WINDOW_BASE_AREA =
        2,                                           ///< bool: the size limit is for the shared windows' box.
    SHARE_CAPTURE_ENGINE_CONFIG_FORCE_FRAME = 3,     ///< bool: deliver the next frame whatever it is.
    SHARE_CAPTURE_ENGINE_CONFIG_EXCLUDE_MENUBAR = 4, ///< bool: keep the menu bar out of application shares.
    SHARE_CAPTURE_ENGINE_CONFIG_DISABLE_SYSTEM_ANIMATION = 5,     ///< bool: stored only.
    SHARE_CAPTURE_ENGINE_CONFIG_ENABLE_MAG_CATCH_EXCEPTION = 6,   ///< bool: stored only.
    SHARE_CAPTURE_ENGINE_CONFIG_MAG_MAX_EXCLUDE_WINDOW_COUNT = 7, ///< int: stored only; 0 or less means 12.
    SHARE_CAPTURE_ENGINE_CONFIG_ENABLE_IPC_SCREEN_CAPTURER = 8,   ///< bool: stored only.
    SHARE_CAPTURE_ENGINE_CONFIG_SHARE_CONTENT_TYPE = 9,           ///< unsigned, 0 or 1: stored only.
};

/// What an engine has done since its last Start. Read without a lock: fields may be of neighbouring passes.
struct SHARE_CAPTURE_STATISTIC {
    int nTotalFrames;                           ///< Frames delivered.
    int m_nMsAverageCaptureTime;                ///< Mean time between delivered frames, ms.
    int m_nMsAverageDeliverCapabilityTime;      ///< Mean time that the sink takes for a frame, ms.
    unsigned m_nMsAverageCaptureCapabilityTime; ///< Mean time that capture and composition take, ms.
    int nCaptureWidth;                          ///< Of the last delivered frame.
    int nCaptureHeight;
    int nCaptureFps;                   ///< Passes with content in the last measuring window, a second.
    int nDuplicateFrames;              ///< Frames found equal to the one before.
    unsigned nFlags;                   ///< Bit 1: fell back to the default capture mode at least once.
    SCREEN_CAPTURER_TYPE eCaptureMode; ///< Capture mode at the moment of reading.
};

/// The client's side of an engine.
///
/// Threads:  OnCaptureData comes on the engine's worker, inside the pass; everything else on one assist
///           thread that all engines of the process share. Calls of one engine never overlap.
/// May do:   call the engine, except Stop and DestroyShareCaptureEngine, which are refused with -1 from
///           inside a callback of that engine: post them to another thread. Stop, Destroy and SetSink of
///           another engine are refused with -1 when a callback of that one waits for this one, as they do
///           that stop each other's engines. Must not block on a thread that is calling Stop or SetSink of
///           the engine. A slow sink delays its engine's frames and every engine's events.
/// Lifetime: neither owned nor counted. After SetSink(nullptr) has returned, nothing arrives any more.
class IShareCaptureEngineSink {
public:
    /// Size of what is shared, in points.
    virtual void OnCaptureDisplaySizeChanged(TVLSize size) = 0;
    /// The windows in the picture, top of the stack first. `windows` is null when there are none.
    virtual void OnCapturedWindowListChanged(const unsigned* windows, int count) = 0;
    /// A SHARE_CAPTURE_ENGINE_STATUS.
    virtual void OnCaptureStatusChanged(int status) = 0;
    /// A frame, to be read during the call only. `rcUpdate` is the part that holds shared content, in frame
    /// pixels.
    virtual void OnCaptureData(IShareFrame* frame, TVLRect& rcUpdate) = 0;
    /// SHARE_CAPTURE_DISPLAY_GONE, SHARE_CAPTURE_NO_SHARED_APP, or a code of the capturer's own. Capture goes
    /// on.
    virtual void OnCaptureError(int code) = 0;
    /// Where what is shared lies in the global space, in points.
    virtual void OnCapturePositionChanged(int x, int y, int width, int height) = 0;
    /// A SHARE_CAPTURE_EVENT, or one of the capturer's own; `data` is passed on as it was given.
    virtual void OnCaptureEvent(int type, int value, void* data) = 0;

protected:
    ~IShareCaptureEngineSink() = default;
};

/// Captures at a rate and hands frames to its sink.
///
/// Order:    CreateShareCaptureEngine, sources, SetSink, Start, … Stop, DestroyShareCaptureEngine.
/// Threads:  any, also several at once. What touches the capturer runs at once before Start and gives its
///           real result; after Start it is posted to the engine's worker, runs between passes and gives 0
///           at once. The caller holds no lock that a sink of any engine wants while it calls Stop: Stop
///           waits for the pass in progress and for events already under way.
/// Errors:   SHARE_RESULT codes. A failing capture never stops an engine.
class IShareCaptureEngine : public IShareCapturerSourceMgr {
public:
    virtual ~IShareCaptureEngine() = default;

    /// 0 when started or running (or paused) already; -4 without a capturer, -6 with nothing to share, -1
    /// when the worker cannot be started. May follow Stop.
    virtual int Start() = 0;
    /// Returns after the pass in progress; no frame and no event of this run follows. -1 from inside a
    /// callback of this engine, or of one that a callback of this engine waits for.
    virtual int Stop() = 0;
    /// The worker goes on ticking and delivers nothing. -1 when stopped.
    virtual int Pause() = 0;
    virtual int Resume() = 0;
    /// Null for none; then returns only when a running callback has ended. -1 when that one waits for the
    /// calling thread.
    virtual int SetSink(IShareCaptureEngineSink* sink) = 0;
    virtual int SetCaptureFps(unsigned fps) = 0;
    virtual int SetCaptureMaxFrameSize(unsigned width, unsigned height) = 0;
    virtual int SetFilterSelf(bool filter) = 0;
    virtual int AddSharedWindow(unsigned window) = 0;
    virtual int RemoveSharedWindow(unsigned window) = 0;
    virtual int AddUnSharedWindow(unsigned window) = 0;
    virtual int RemoveUnSharedWindow(unsigned window) = 0;
    /// Application engines only; -3 on the others.
    virtual int AddSharedProcess(unsigned pid) = 0;
    virtual int RemoveSharedProcess(unsigned pid) = 0;
    virtual int AddUnSharedProcess(unsigned pid) = 0;
    virtual int RemoveUnSharedProcess(unsigned pid) = 0;
    /// Desktop engines only; -3 on the others.
    virtual int SelectSharedDisplay(unsigned display) = 0;
    /// 0, also when the new way of capturing cannot be set up; -5 for a mode that is not offered.
    virtual int SetCaptureMode(SCREEN_CAPTURER_TYPE mode) = 0;
    /// 0xRRGGBB, for the whole process.
    virtual int SetAppShareBackgroundColor(int rgb) = 0;
    virtual SHARE_CAPTURE_ENGINE_TYPE GetCaptureEngineType() = 0;
    virtual SHARE_CAPTURE_ENGINE_STATUS GetCaptureStatus() = 0;
    /// Size of what is shared, in points.
    virtual void GetCaptureSize(TVLSize& size) = 0;
    virtual int GetShareCaptureStatistic(SHARE_CAPTURE_STATISTIC& statistic) = 0;
    virtual bool IsAppShared(unsigned pid) = 0;
    virtual bool IsWindowShared(unsigned window) = 0;
    /// User-customisation engines only, while stopped; -1 otherwise. Null takes the capturer away. It stays
    /// the client's.
    virtual int SetExternalIShareCapturer(IShareCapturer* capturer) = 0;
    /// User-customisation engines only: the client shows the pointer itself. -1 on the others.
    virtual int EnableExternalISharePointing(bool enable) = 0;
    virtual int SetCaptureThreadCount(unsigned count) = 0;
    /// Sets a switch. `size` is exactly that of the switch's type; -2 otherwise.
    virtual int Config(SHARE_CAPTURE_ENGINE_CONFIG selector, void* data, unsigned size) {
        (void)selector;
        (void)data;
        (void)size;
        return SHARE_RESULT_FAILED;
    }
};
