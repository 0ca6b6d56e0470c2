// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/av_foundation.h"
#include "platform/core_types.h"
#include "src/share_atomic.h"

#include <screenshare/share_types.h>

#include <cstddef>
#include <cstdint>
#include <deque>
#include <memory>
#include <mutex>
#include <optional>

class IShareFrame;

/// Which samples may be looked at while something must not be seen: those of the very stack of windows and
/// the very place of the display that the masks were made for.
struct ShareSampleGate {
    std::uint64_t generation = 0; ///< Of the windows that were walked; 0 for none: no sample passes.
    TVLRect display{};            ///< Global points.
};

/// One display's capture session: sets it up, starts and stops it without letting what it raises escape,
/// keeps its newest samples, and copies one into a frame when asked. It knows nothing of shared windows.
///
/// Lifetime: shared; make it with std::make_shared. Its sample queue keeps it from
///           createVideoInputAndOutput until destroyVideoInputAndOutput and the queue's last block, so the
///           owner ends it with stopRun and then destroyVideoInputAndOutput, which a session that died needs.
/// Threads:  captures, setScale, setFPS, start and stop on the capture thread; setInputDisplay also on the
///           notice thread; samples come on the session's queue.
/// Errors:   0, -1, also without memory, and the codes that are told at the operations. What a start or a
///           stop raises becomes -1; but setInputDisplay lets all pass that its stop raises. Exceptions that
///           are no NSException go on up from whatever starts or stops, and std::bad_alloc of the frame from
///           captureToIShareFrame.
class ShareAVFCapturer final : public platform::AVCaptureVideoDataOutputSampleBufferDelegate,
                               public std::enable_shared_from_this<ShareAVFCapturer> {
public:
    ShareAVFCapturer();
    ~ShareAVFCapturer() override;
    ShareAVFCapturer(const ShareAVFCapturer&) = delete;
    ShareAVFCapturer& operator=(const ShareAVFCapturer&) = delete;

    /// Makes the session. Always true: one that could not be made shows itself later. Once, before anything
    /// else.
    bool initShareAVFCapturer();

    bool isValid() const { return m_captureSession != nullptr; }
    bool isRunning() const;
    platform::CGRect getCaptureRect() const;
    float scaleFactor() const { return m_fScaleFactor; }

    /// A negative rate changes nothing. Gives the rate in force.
    int setFPS(int fps);
    /// The size that pictures are to fit; the session scales, but never below 0.4. -311 when there is no
    /// input or nothing to do, -1 when the input has not taken the scale exactly.
    unsigned setScale(TVLSize size);
    /// Comes into force with the next input.
    void setCapturesCursor(bool captures) { m_bCapturesCursor = captures; }

    /// Begins with an input of the captured display, or follows its new resolution. -1 for a display without
    /// an area.
    int initDisplay(bool bDisplayChanged);
    /// Stops, goes over to the display, and starts. Samples of another display or resolution are dropped.
    int setInputDisplay(unsigned display);
    int createVideoInputAndOutput();
    int destroyVideoInputAndOutput();
    int startRun();
    int stopRun();
    /// Stops and starts a session that runs, and drops what it has given: the next sample is of now.
    void beginAnew();
    /// -2 before any display is known.
    int updateVideoFormat();

    void captureOutput(platform::AVCaptureVideoDataOutput* output,
                       const platform::CMSampleBufferRef& sampleBuffer,
                       platform::AVCaptureConnection* connection) override;

    /// Without a gate all samples may be looked at, as at first. On the capture thread.
    void setGate(const std::optional<ShareSampleGate>& gate) { m_gate = gate; }
    /// The oldest sample that may be looked at, copied into the frame: size, format, line length, timestamp
    /// and pixels. -302 when there is no sample, -1 for null (a sample goes all the same), for samples that
    /// can't be opened or may not be, and for a picture with rows that are too short. `frame` may be null.
    unsigned captureToIShareFrame(IShareFrame* frame);
    /// Of the last sample that was looked at: it did not pass since the window server could not tell which
    /// stack it shows. On the capture thread.
    bool isStackUntold() const { return m_isStackUntold; }

    void runtimeError(const platform::AVCaptureNotification& notification);
    void didStartRunning(const platform::AVCaptureNotification& notification);
    void didStopRunning(const platform::AVCaptureNotification& notification);
    /// The sample queue has drained.
    void captureCleanup();

private:
    static constexpr std::size_t KEPT_SAMPLES = 2;
    static constexpr int OK = SHARE_RESULT_OK;
    static constexpr int FAILED = SHARE_RESULT_FAILED;

    const void* SessionAddress() const;
    void FollowResolution(TVLSize display);
    void AddScreenInput();
    std::shared_ptr<platform::AVCaptureVideoDataOutput> RemoveInputAndOutput();
    bool StartSession();
    bool StopSession();
    std::optional<int> CopySample(const platform::CMSampleBuffer* sample, IShareFrame* frame);
    void TraceShortRows(std::size_t rowBytes, std::size_t width);
    void clearSampleBufferQueue();

    std::shared_ptr<platform::AVCaptureSession> m_captureSession; // never changes once it is made
    // Guarded by m_mutexConfig.
    std::shared_ptr<platform::AVCaptureScreenInput> m_screenInput;
    std::shared_ptr<platform::AVCaptureVideoDataOutput> m_videoOutput;

    ShareRelaxed<unsigned> m_CaptureDisplayId;
    ShareRelaxed<int> m_capture_scaled_width;
    ShareRelaxed<int> m_capture_scaled_height;
    std::deque<platform::CMSampleBufferRef> m_sampleBufferQueue; // guarded by m_mutex
    /// Nothing is waited for and no other mutex taken while it is held: the session's delegate needs it to
    /// end.
    std::mutex m_mutex;
    /// Makes each change of the session one. May be held while the session is waited for.
    mutable std::recursive_mutex m_mutexConfig;
    ShareRelaxed<int> m_nFPS{35};
    ShareRelaxed<float> m_fScaleFactor{1.0F};
    bool m_bIsFistTrace = true; // capture thread only
    ShareRelaxed<bool> m_bCapturesCursor{true};
    ShareRelaxed<int> m_capture_width;
    ShareRelaxed<int> m_capture_height;
    std::optional<ShareSampleGate> m_gate; // capture thread only
    bool m_isStackUntold = false;          // capture thread only
};
