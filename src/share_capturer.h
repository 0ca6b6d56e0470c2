// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_capturer.h>

#include <memory>
#include <mutex>
#include <vector>

class ShareCapturerContext;

/// What happened to a source. Any other number is told to nobody.
enum SHARE_CAPTURER_SOURCE_NOTIFY : int {
    SHARE_CAPTURER_SOURCE_NOTIFY_ADDED = 0,
    SHARE_CAPTURER_SOURCE_NOTIFY_REMOVED = 1,
};

/// Where the library's own capturers start: the lists of sinks and sources, the way to the context, and an
/// answer for everything but Capture.
///
/// Ownership: a reference on each source, a share of the context, nothing of the sinks.
/// Threads:   any. One recursive lock guards both lists. It is held while the sinks are told something: once
///            RemoveSink has returned, that sink hears nothing more. A sink may call the capturer back, and
///            must not wait for another thread that does. NotifyCaptureAppsCrossMultiMonitor is the capture
///            thread's.
/// Errors:    SHARE_RESULT codes. What a sink throws is traced and dropped.
class CShareCapturer : public IShareCapturer {
public:
    /// The context may be empty; what needs it then gives -4.
    explicit CShareCapturer(const std::shared_ptr<ShareCapturerContext>& context);
    ~CShareCapturer() override;
    CShareCapturer(const CShareCapturer&) = delete;
    CShareCapturer& operator=(const CShareCapturer&) = delete;

    int AddCaptureShareSource(IShareSource* source) override;
    /// Takes the source's id off the shared applications first, whatever kind of source it is and even if it
    /// is not on the list.
    int RemoveCaptureShareSource(IShareSource* source) override;
    int GetCaptureShareSourceCount() override;
    IShareSource* GetCaptureShareSource(int index) override;

    int SetCaptureMaxSize(TVLSize) override { return SHARE_RESULT_OK; }
    unsigned GetCurrentCaptureDisplayId() override { return SHARE_INVALID_DISPLAY; }
    /// The size of the captured display's picture; -1 with nothing shared, or without a display.
    int GetCurrentCaptureSourceSize(TVLSize& size) override;
    /// Where the first source is.
    int GetCurrentCaptureSourcePosition(int& x, int& y, int& width, int& height) override;
    int SetFilterSelf(bool filter) override;
    int AddSharedWindow(unsigned window) override;
    int RemoveSharedWindow(unsigned window) override;
    int AddUnSharedWindow(unsigned window) override;
    int RemoveUnSharedWindow(unsigned window) override;
    int AddSharedProcess(unsigned) override { return SHARE_RESULT_NOT_AVAILABLE; }
    int RemoveSharedProcess(unsigned) override { return SHARE_RESULT_NOT_AVAILABLE; }
    int AddUnSharedProcess(unsigned pid) override;
    int RemoveUnSharedProcess(unsigned pid) override;
    int SelectSharedDisplay(unsigned) override { return SHARE_RESULT_NOT_AVAILABLE; }
    bool IsAppShared(unsigned pid) override;
    bool IsWindowShared(unsigned window) override;
    bool PointerCaptured() override { return false; }
    int SetFPS(int) override { return SHARE_RESULT_NOT_SUPPORTED; }
    bool Reinit() override { return false; }
    bool IsWindowAreaBaseContentSupport() override { return false; }
    int SetCaptureThreadCount(unsigned) override { return SHARE_RESULT_NOT_SUPPORTED; }
    float GetScaleFactor() const override;
    void Stop() override {}
    int AddSink(IShareCapturerSink* sink) override;
    int RemoveSink(IShareCapturerSink* sink) override;
    int CleanSink() override;
    /// Takes off the first application source with that process id.
    int RemoveCaptureShareSourceApp(unsigned pid) override;
    bool IsIpcCapturer() const override { return false; }

protected:
    using SinkPlace = std::vector<IShareCapturerSink*>::iterator;
    using SourcePlace = std::vector<IShareSource*>::iterator;

    void NotifyCaptureDisplaySizedChanged(TVLSize size);
    void NotifyCaptureNoSharedApp();
    void NotifyCaptureSharedAppDisplayChange(unsigned display, int left, int top, int width, int height);
    /// Called at each pass. The sinks hear of a change once it has stood for more than a second.
    void NotifyCaptureAppsCrossMultiMonitor(bool cross);
    void NotifyCaptureDisplayChanged(bool present);
    void NotifyCaptureShareSourceModified(IShareSource* source, SHARE_CAPTURER_SOURCE_NOTIFY notify);

    /// The end for null and for what is not there. The caller holds m_mutexLists.
    SinkPlace FindSink(IShareCapturerSink* sink);
    SourcePlace FindShareSource(IShareSource* source);

    /// Drops all sinks and sources.
    void Cleanup();

    std::recursive_mutex m_mutexLists;
    std::vector<IShareCapturerSink*> m_vecSinks;  // guarded by m_mutexLists
    std::vector<IShareSource*> m_vecShareSources; // guarded by m_mutexLists; a reference on each
    std::shared_ptr<ShareCapturerContext> m_shareCapturerContext;

    // Capture thread only.
    bool m_bCrossMonitorPending = false;
    bool m_bCrossMonitorReported = false;
    unsigned m_tickCrossMonitorChanged = 0; // ms; 0 when no change waits

private:
    template <class Call>
    void TellSinks(Call call);
    template <class Call>
    int AskContext(Call call);
    SourcePlace FindAppSource(unsigned pid);
};
