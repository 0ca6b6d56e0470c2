// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/av_foundation_samples.h"
#include "platform/core_types.h"
#include "platform/dispatch.h"

#include <cstdint>
#include <exception>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <utility>
#include <vector>

/// The capture session: a display's pictures, pushed as sample buffers at a rate.
///
/// Threads:  any.
/// Lifetime: all objects are shared. A session keeps what was added to it, an output its queue but not its
///           delegate.
/// Errors:   an operation that fails gives null, false or nothing. Only startRunning and stopRunning throw.
namespace platform {

class CaptureSessionCore;

/// What startRunning and stopRunning raise.
class NSException : public std::exception {
public:
    NSException(std::string name, std::string reason)
        : m_name(std::move(name)),
          m_reason(std::move(reason)) {}

    const std::string& name() const { return m_name; }
    const std::string& reason() const { return m_reason; }
    /// The text for people.
    const std::string& description() const { return m_reason; }
    const char* what() const noexcept override { return m_reason.c_str(); }

private:
    std::string m_name;
    std::string m_reason;
};

struct NSError {
    std::string localizedDescription;
};

// ---- Input

/// A display as the source of a session. Changes show from the next picture on.
class AVCaptureScreenInput {
public:
    /// Null for a display that isn't there, and without memory.
    static std::shared_ptr<AVCaptureScreenInput> initWithDisplayID(CGDirectDisplayID display) noexcept;

    explicit AVCaptureScreenInput(CGDirectDisplayID display) : m_display(display) {}
    AVCaptureScreenInput(const AVCaptureScreenInput&) = delete;
    AVCaptureScreenInput& operator=(const AVCaptureScreenInput&) = delete;

    CGDirectDisplayID displayID() const { return m_display; }

    /// The least time between two samples. One that isn't above zero, as at first, stands for a 30th second.
    void setMinFrameDuration(const CMTime& duration) noexcept;
    CMTime minFrameDuration() const noexcept;

    /// Whether there is no sample at all while nothing changes; true at first.
    void setRemovesDuplicateFrames(bool removes) noexcept;
    bool removesDuplicateFrames() const noexcept;

    /// Whether the pointer is in the picture; false at first.
    void setCapturesCursor(bool captures) noexcept;
    bool capturesCursor() const noexcept;

    static constexpr CGFloat SMALLEST_SCALE_FACTOR = 0.4F;
    /// Held between 0.4 and 1, which it is at first. NaN changes nothing.
    void setScaleFactor(CGFloat factor) noexcept;
    CGFloat scaleFactor() const noexcept;

    /// What of the display is captured, in points from its top left corner. Without an area, as at first, all
    /// of it. A rectangle of which nothing lies on the display gives no samples.
    void setCropRect(const CGRect& rect) noexcept;
    CGRect cropRect() const noexcept;

private:
    const CGDirectDisplayID m_display;

    mutable std::mutex m_mutex;
    // Guarded by m_mutex.
    CMTime m_minFrameDuration;
    bool m_removesDuplicateFrames = true;
    bool m_capturesCursor = false;
    CGFloat m_scaleFactor = 1.0F;
    CGRect m_cropRect;
};

// ---- Output

/// Between the input and the output of one session.
class AVCaptureConnection {
public:
    bool isVideoMinFrameDurationSupported() const noexcept;
    /// Takes part beside the input's: the longer one holds. A time that isn't above zero takes no part.
    void setVideoMinFrameDuration(const CMTime& duration) noexcept;
    CMTime videoMinFrameDuration() const noexcept;

    bool isVideoMaxFrameDurationSupported() const noexcept;
    /// Only kept: a display that stands still gives no samples for however long.
    void setVideoMaxFrameDuration(const CMTime& duration) noexcept;
    CMTime videoMaxFrameDuration() const noexcept;

private:
    mutable std::mutex m_mutex;
    CMTime m_minFrameDuration; // guarded by m_mutex
    CMTime m_maxFrameDuration; // guarded by m_mutex
};

class AVCaptureVideoDataOutput;

/// Takes samples in, on the queue that it was set with.
class AVCaptureVideoDataOutputSampleBufferDelegate {
public:
    virtual ~AVCaptureVideoDataOutputSampleBufferDelegate() = default;
    /// May do anything with the session, drop its last share included. What it throws is traced and goes no
    /// further.
    virtual void captureOutput(AVCaptureVideoDataOutput* output, const CMSampleBufferRef& sampleBuffer,
                               AVCaptureConnection* connection) = 0;
};

/// The key of the pixel format in video settings.
inline constexpr const char* kCVPixelBufferPixelFormatTypeKey = "PixelFormatType";
using AVVideoSettings = std::map<std::string, std::uint32_t>;

/// Gives a session's samples to a delegate. Belongs to one session at a time.
class AVCaptureVideoDataOutput {
public:
    /// Null without memory.
    static std::shared_ptr<AVCaptureVideoDataOutput> init() noexcept;

    AVCaptureVideoDataOutput();
    AVCaptureVideoDataOutput(const AVCaptureVideoDataOutput&) = delete;
    AVCaptureVideoDataOutput& operator=(const AVCaptureVideoDataOutput&) = delete;

    /// Without a delegate that lives, and without a queue, there are no calls. The former delegate gets no
    /// more of them; one that runs isn't waited for. `queue` should be serial.
    void setSampleBufferDelegate(std::weak_ptr<AVCaptureVideoDataOutputSampleBufferDelegate> delegate,
                                 dispatch_queue_t queue) noexcept;

    /// Nothing restores the defaults. Of what is in them only the pixel format counts; one that is none of
    /// CVPixelFormatType leaves that in force. RGBA at first.
    void setVideoSettings(const std::optional<AVVideoSettings>& settings) noexcept;
    /// Empty without memory.
    AVVideoSettings videoSettings() const noexcept;

    /// Whether a sample that the delegate hasn't been given when the next one is there is dropped, true at
    /// first. Without that they wait, as many as there are buffers; then pictures are left out.
    void setAlwaysDiscardsLateVideoFrames(bool discards) noexcept;
    bool alwaysDiscardsLateVideoFrames() const noexcept;

    /// One in a session that has an input, too; else none.
    std::vector<std::shared_ptr<AVCaptureConnection>> connections() const noexcept;

private:
    friend class CaptureSessionCore;

    struct Delivery {
        std::weak_ptr<AVCaptureVideoDataOutputSampleBufferDelegate> delegate;
        dispatch_queue_t queue;
    };

    Delivery GetDelivery() const;
    std::uint32_t PixelFormat() const;
    void SetConnection(std::shared_ptr<AVCaptureConnection> connection);

    mutable std::mutex m_mutex;
    // Guarded by m_mutex.
    Delivery m_delivery;
    std::uint32_t m_pixelFormat;
    bool m_discardsLate = true;
    std::shared_ptr<AVCaptureConnection> m_connection;
};

// ---- Session

/// Has one input and one output at most.
///
/// Samples:  while it runs, the first picture at once and then the newest one each frame duration, if there
///           is a change, go to the output's delegate on its queue. Where only the stack of windows is
///           another one, the sample has the pixels of the one before and generations of its own. Without an
///           input or an output it runs and gives nothing.
/// Stopping: after stopRunning, and after the end of the session, no call of the delegate begins, and none
///           runs any more; from inside such a call, or inside a notification, they don't wait.
/// Dying:    a display that was removed, a window server that was lost and a permission that was taken back
///           end the running by themselves: AVCaptureSessionRuntimeErrorNotification, then
///           AVCaptureSessionDidStopRunningNotification. A sample on its way may still be delivered then. A
///           server that is only stalled is waited for.
/// Thread:   "scn-sample", from start to stop. While the platform rests there is none and a session that
///           runs gives no samples; Wake, or startRunning, has it go on.
class AVCaptureSession {
public:
    /// Null without memory.
    static std::shared_ptr<AVCaptureSession> init() noexcept;

    explicit AVCaptureSession(std::shared_ptr<CaptureSessionCore> core);
    ~AVCaptureSession();
    AVCaptureSession(const AVCaptureSession&) = delete;
    AVCaptureSession& operator=(const AVCaptureSession&) = delete;

    /// What is changed in between comes into force as a whole with the last commit.
    void beginConfiguration() noexcept;
    void commitConfiguration() noexcept;

    /// False for null, and while there is one already.
    bool canAddInput(const std::shared_ptr<AVCaptureScreenInput>& input) const noexcept;
    bool canAddOutput(const std::shared_ptr<AVCaptureVideoDataOutput>& output) const noexcept;
    /// Nothing happens with one that can't be added, or isn't there.
    void addInput(const std::shared_ptr<AVCaptureScreenInput>& input) noexcept;
    void removeInput(const std::shared_ptr<AVCaptureScreenInput>& input) noexcept;
    void addOutput(const std::shared_ptr<AVCaptureVideoDataOutput>& output) noexcept;
    void removeOutput(const std::shared_ptr<AVCaptureVideoDataOutput>& output) noexcept;

    /// Comes back when it runs, or can't: then AVCaptureSessionRuntimeErrorNotification has been posted.
    /// Throws NSException between beginConfiguration and commitConfiguration.
    void startRunning();
    void stopRunning();
    /// Takes no lock.
    bool isRunning() const noexcept;

private:
    friend class AVCaptureNotificationCenter;

    const std::shared_ptr<CaptureSessionCore> m_core;
};

// ---- Notifications

enum AVCaptureNotificationName : int {
    AVCaptureSessionRuntimeErrorNotification,
    AVCaptureSessionDidStartRunningNotification,
    AVCaptureSessionDidStopRunningNotification,
};

struct AVCaptureUserInfo {
    NSError AVCaptureSessionErrorKey; ///< Of a runtime error.
};

struct AVCaptureNotification {
    AVCaptureNotificationName name{};
    AVCaptureUserInfo userInfo;
};

/// Where sessions tell what becomes of them, on the thread that does it or finds it out, with no lock held
/// but one of the registration.
class AVCaptureNotificationCenter {
public:
    static AVCaptureNotificationCenter* defaultCenter() noexcept;

    /// Has `selector` called for each notification of that name and session, one call at a time. `observer`
    /// is only the name under which it is removed again. What the selector throws is traced and goes no
    /// further. False for no selector, no session and no memory; then nothing was registered.
    bool addObserver(const void* observer, std::function<void(const AVCaptureNotification&)> selector,
                     AVCaptureNotificationName name,
                     const std::shared_ptr<AVCaptureSession>& object) noexcept;

    /// Ends all registrations of that observer. After it has returned none of its selectors is called any
    /// more: it waits for a call of one that runs, except from inside that very call.
    void removeObserver(const void* observer) noexcept;
};

} // namespace platform
