// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_frame.h>
#include <screenshare/share_source.h>
#include <screenshare/share_types.h>

#include <vector>

struct SHARE_CAPTURE_STATISTIC;

/// What IShareCapturer::Capture answers. Any other number counts as a failure, too.
enum SHARE_CAPTURE_RESULT : int {
    SHARE_CAPTURE_OK = 0,               ///< A new picture is in the frame.
    SHARE_CAPTURE_FAILED = -1,          ///< Failed.
    SHARE_CAPTURE_FATAL = -7,           ///< This way of capturing can't work: fall back at once.
    SHARE_CAPTURE_DISPLAY_GONE = -203,  ///< The captured display went away. Also an error code to the sink.
    SHARE_CAPTURE_NO_SHARED_APP = -204, ///< Only an error code to the sink: no shared application is left.
    SHARE_CAPTURE_NO_DATA = -302,       ///< Nothing to show this time; not a failure.
    SHARE_CAPTURE_DRAGGING = -303,      ///< Held back while something is being dragged; not a failure.
    SHARE_CAPTURE_NOT_READY = -304,     ///< No finished picture yet; counts as a failure.
};

/// Hears what a capturer finds out. The engine is the sink of its capturer.
///
/// Threads: called on whatever thread the capturer finds it out. A capturer of a client's own calls no sink
///          while it holds a lock that one of its IShareCapturer operations takes.
/// Results: 0; capturers need not look at them.
class IShareCapturerSink {
public:
    virtual int OnShareSourceAdded(IShareSource* source) = 0;
    virtual int OnShareSourceRemoved(IShareSource* source) = 0;
    virtual int OnCapturedDisplaySizedChanged(TVLSize size) = 0;
    /// true: a display came; false: the captured display has gone.
    virtual int OnCapturedDisplayChanged(bool present) = 0;
    virtual int OnCapturedNoSharedApp() = 0;
    virtual int OnCapturedAppDisplayChanged(unsigned display, int left, int top, int width, int height) = 0;
    virtual int OnCapturedWindowChanged(std::vector<unsigned>& windows) = 0;
    virtual int OnCapturedAppsCrossMultiMonitors(bool cross) = 0;
    virtual int OnCaptureStatusChanged(int status) = 0;
    virtual int OnCapturePositionChanged(int x, int y, int width, int height) = 0;
    virtual int OnCaptureEvent(int type, int value, void* data) = 0;
    virtual int OnCaptureError(int code) = 0;
    virtual int OnCaptureStatistics(SHARE_CAPTURE_STATISTIC& statistic) = 0;

protected:
    ~IShareCapturerSink() = default;
};

/// The sources that a capturer or an engine captures.
class IShareCapturerSourceMgr {
public:
    virtual int AddCaptureShareSource(IShareSource* source) = 0;
    virtual int RemoveCaptureShareSource(IShareSource* source) = 0;
    virtual int GetCaptureShareSourceCount() = 0;
    /// Null for an index out of range. No reference is added: valid only while somebody keeps the source.
    virtual IShareSource* GetCaptureShareSource(int index) = 0;

protected:
    ~IShareCapturerSourceMgr() = default;
};

/// The sinks of a capturer. Sinks are neither owned nor counted: remove one before it is destroyed.
class IShareCapturerSinkMgr {
public:
    virtual int AddSink(IShareCapturerSink* sink) = 0;
    virtual int RemoveSink(IShareCapturerSink* sink) = 0;
    virtual int CleanSink() = 0;

protected:
    ~IShareCapturerSinkMgr() = default;
};

/// Fetches one picture a pass. The library brings its own; a client may bring another and hand it to an
/// engine of the user-customisation kind. Derive that one from CShareCapturerBase (share_capturer_base.h),
/// which answers everything but Capture.
///
/// Threads:  Capture, SetCaptureMaxSize, PointerCaptured, GetScaleFactor and Stop come on the engine's
///           worker. The control operations come on the worker while the engine runs and on the client's
///           thread before; an engine never makes two calls at once on a client's capturer.
/// Lifetime: a client's capturer belongs to the client and must outlive its engine's last pass.
/// Errors:   SHARE_RESULT codes, SHARE_CAPTURE_RESULT from Capture. An exception that leaves Capture counts
///           as SHARE_CAPTURE_FAILED.
class IShareCapturer : public IShareCapturerSourceMgr, public IShareCapturerSinkMgr {
public:
    virtual ~IShareCapturer() = default;

    /// Fills the frame: size, format, pixels, meta information; a timestamp of 0 is filled in by the engine.
    /// Gives a SHARE_CAPTURE_RESULT.
    virtual int Capture(IShareFrame* frame) = 0;

    /// The largest picture wanted, in pixels. Sent before every Capture: return at once when nothing changed.
    /// A result other than 0 makes the engine skip the capture.
    virtual int SetCaptureMaxSize(TVLSize size) = 0;
    virtual unsigned GetCurrentCaptureDisplayId() = 0;
    /// Size of what is captured, in points.
    virtual int GetCurrentCaptureSourceSize(TVLSize& size) = 0;
    /// Where in the global space it is, in points.
    virtual int GetCurrentCaptureSourcePosition(int& x, int& y, int& width, int& height) = 0;
    /// Keep the process's own windows out of the picture.
    virtual int SetFilterSelf(bool filter) = 0;
    virtual int AddSharedWindow(unsigned window) = 0;
    virtual int RemoveSharedWindow(unsigned window) = 0;
    virtual int AddUnSharedWindow(unsigned window) = 0;
    virtual int RemoveUnSharedWindow(unsigned window) = 0;
    virtual int AddSharedProcess(unsigned pid) = 0;
    virtual int RemoveSharedProcess(unsigned pid) = 0;
    virtual int AddUnSharedProcess(unsigned pid) = 0;
    virtual int RemoveUnSharedProcess(unsigned pid) = 0;
    virtual int SelectSharedDisplay(unsigned display) = 0;
    virtual bool IsAppShared(unsigned pid) = 0;
    virtual bool IsWindowShared(unsigned window) = 0;
    /// The last picture has the pointer in it.
    virtual bool PointerCaptured() = 0;
    virtual int SetFPS(int fps) = 0;
    /// Makes the capturer ready on what its context says; true when it is usable.
    virtual bool Reinit() = 0;
    /// The picture is already cut to the shared windows.
    virtual bool IsWindowAreaBaseContentSupport() = 0;
    virtual int SetCaptureThreadCount(unsigned count) = 0;
    /// Frame pixels per point, where a frame's meta information doesn't tell.
    virtual float GetScaleFactor() const = 0;
    /// The worker's last call.
    virtual void Stop() = 0;
    int AddSink(IShareCapturerSink* sink) override = 0;
    int RemoveSink(IShareCapturerSink* sink) override = 0;
    int CleanSink() override = 0;
    virtual int RemoveCaptureShareSourceApp(unsigned pid) = 0;
    virtual bool IsIpcCapturer() const = 0;
};
