// SPDX-License-Identifier: Apache-2.0
#include "src/mac/avfoundation/share_avf_capturer.h"

#include "platform/core_graphics.h"
#include "platform/dispatch.h"
#include "src/app_share_config.h"
#include "src/mac/avfoundation/share_avf_session_change.h"
#include "util/cm_trace.h"

#include <exception>
#include <new>
#include <utility>

namespace {

using Output = platform::AVCaptureVideoDataOutput;
using ConfigLock = std::lock_guard<std::recursive_mutex>;

/// Ends an output. Its queue may go with it, and the queue's share of the capturer: so make it before the
/// lock.
class OutputEnd {
public:
    OutputEnd() = default;
    ~OutputEnd() {
        if (m_output != nullptr)
            m_output->setSampleBufferDelegate({}, nullptr);
    }
    OutputEnd(const OutputEnd&) = delete;
    OutputEnd& operator=(const OutputEnd&) = delete;

    void Take(std::shared_ptr<Output> output) { m_output = std::move(output); }

private:
    std::shared_ptr<Output> m_output;
};

/// What a sample queue has as its context.
using CapturerShare = std::shared_ptr<ShareAVFCapturer>;

void EndSampleQueue(void* context) {
    const std::unique_ptr<CapturerShare> share(static_cast<CapturerShare*>(context));
    (*share)->captureCleanup();
}

/// Null without memory.
platform::dispatch_queue_t CreateSampleQueue(CapturerShare capturer) {
    platform::dispatch_queue_t queue;
    try {
        auto share = std::make_unique<CapturerShare>(std::move(capturer));
        queue = platform::dispatch_queue_create("qvn.ShareAVFCapturer", platform::DISPATCH_QUEUE_SERIAL);
        if (queue == nullptr)
            return queue;
        platform::dispatch_set_context(queue, share.release());
        platform::dispatch_set_finalizer_f(queue, EndSampleQueue);
    } catch (const std::bad_alloc&) {
        return nullptr;
    }
    return queue;
}

} // namespace

// ---- Life

ShareAVFCapturer::ShareAVFCapturer()
    : m_CaptureDisplayId(platform::CGMainDisplayID()),
      m_bCapturesCursor((AppShareConfig::Instance()->m_nShareConfigFlags & SHARE_CONFIG_FLAG_NO_POINTER) ==
                        0) {}

ShareAVFCapturer::~ShareAVFCapturer() {
    CmTraceInfo("[ShareAVFCapturer dealloc] capture session = ", SessionAddress(), ", self = ", this);
    platform::AVCaptureNotificationCenter::defaultCenter()->removeObserver(this);
    if (isValid()) {
        m_captureSession->removeInput(m_screenInput);
        m_captureSession->removeOutput(m_videoOutput);
    }
    m_screenInput = nullptr;
    m_videoOutput = nullptr;
    m_captureSession = nullptr;
    clearSampleBufferQueue();
}

bool ShareAVFCapturer::initShareAVFCapturer() {
    using Told = platform::AVCaptureNotification;
    if (isValid())
        return true;
    m_captureSession = platform::AVCaptureSession::init();
    if (isValid()) {
        platform::AVCaptureNotificationCenter* const center =
            platform::AVCaptureNotificationCenter::defaultCenter();
        // They may keep `this`: the destructor waits for one that runs.
        center->addObserver(
            this, [this](const Told& told) { runtimeError(told); },
            platform::AVCaptureSessionRuntimeErrorNotification, m_captureSession);
        center->addObserver(
            this, [this](const Told& told) { didStartRunning(told); },
            platform::AVCaptureSessionDidStartRunningNotification, m_captureSession);
        center->addObserver(
            this, [this](const Told& told) { didStopRunning(told); },
            platform::AVCaptureSessionDidStopRunningNotification, m_captureSession);
    }
    CmTraceInfo("[ShareAVFCapturer initShareAVFCapturer - new sessin created]");
    return true;
}

void ShareAVFCapturer::captureCleanup() {
    CmTraceInfo("[ShareAVFCapturer captureCleanup] self = ", this);
}

bool ShareAVFCapturer::isRunning() const {
    return isValid() && m_captureSession->isRunning();
}

platform::CGRect ShareAVFCapturer::getCaptureRect() const {
    return platform::CGDisplayBounds(m_CaptureDisplayId);
}

const void* ShareAVFCapturer::SessionAddress() const {
    return m_captureSession.get();
}

// ---- Input and output

int ShareAVFCapturer::createVideoInputAndOutput() {
    if (!isValid())
        return FAILED;
    const ConfigLock lock(m_mutexConfig);
    const ShareAVFSessionChange change(*m_captureSession);
    const int code = initDisplay(true);
    if (code != OK)
        return code;
    if (m_videoOutput == nullptr)
        m_videoOutput = Output::init();
    if (m_videoOutput == nullptr) {
        CmTraceWarning("[ShareAVFCapturer createVideoInputAndOutput] create output fail, capture session = ",
                       SessionAddress());
        return FAILED;
    }
    platform::dispatch_queue_t queue = CreateSampleQueue(shared_from_this());
    if (queue == nullptr)
        return FAILED;
    m_videoOutput->setSampleBufferDelegate(weak_from_this(), queue);
    platform::dispatch_release(queue); // the output has it now
    if (m_captureSession->canAddOutput(m_videoOutput))
        m_captureSession->addOutput(m_videoOutput);
    else
        CmTraceInfo("[ShareAVFCapturer createVideoInputAndOutput] cannot add output, display_id = ",
                    unsigned{m_CaptureDisplayId});
    return code;
}

int ShareAVFCapturer::destroyVideoInputAndOutput() {
    OutputEnd end;
    const ConfigLock lock(m_mutexConfig);
    end.Take(RemoveInputAndOutput());
    return OK;
}

/// Gives the output, whose delegate is still to be cleared. With m_mutexConfig held.
std::shared_ptr<Output> ShareAVFCapturer::RemoveInputAndOutput() {
    if (!isValid())
        return nullptr;
    const ShareAVFSessionChange change(*m_captureSession);
    m_captureSession->removeInput(m_screenInput);
    m_screenInput = nullptr;
    m_captureSession->removeOutput(m_videoOutput);
    return std::move(m_videoOutput);
}

// ---- Start and stop

int ShareAVFCapturer::startRun() {
    OutputEnd end;
    const ConfigLock lock(m_mutexConfig);
    if (isRunning())
        return OK;
    int code = createVideoInputAndOutput();
    if (code != OK)
        return code;
    updateVideoFormat();
    code = StartSession() ? OK : FAILED;
    if (!isRunning()) {
        end.Take(RemoveInputAndOutput());
        code = FAILED;
    }
    CmTraceInfo("[ShareAVFCapturer startRun returned with ] ", code);
    return code;
}

int ShareAVFCapturer::stopRun() {
    OutputEnd end;
    const ConfigLock lock(m_mutexConfig);
    if (!isRunning()) {
        CmTraceInfo("[ShareAVFCapturer stopRun] CatpureSession is already stopped");
        return OK;
    }
    int code = OK;
    std::exception_ptr other;
    try {
        code = StopSession() ? OK : FAILED;
    } catch (...) {
        other = std::current_exception();
    }
    end.Take(RemoveInputAndOutput());
    if (other != nullptr)
        std::rethrow_exception(other);
    if (isRunning()) {
        CmTraceError("[ShareAVFCapturer stopRun] CaptureSession is alive after stopRunnig");
        return FAILED;
    }
    return code;
}

void ShareAVFCapturer::beginAnew() {
    const ConfigLock lock(m_mutexConfig);
    const bool wasRunning = isRunning();
    if (wasRunning)
        StopSession();
    clearSampleBufferQueue();
    if (wasRunning)
        StartSession();
}

/// False when that raised. With m_mutexConfig held.
bool ShareAVFCapturer::StartSession() {
    try {
        m_captureSession->startRunning();
        return true;
    } catch (const platform::NSException& exception) {
        CmTraceError("[ShareAVFCapturer startRun] catch exception: ", exception.description(),
                     ", capture session = ", SessionAddress(), ", self = ", this);
        return false;
    }
}

/// False when that raised. With m_mutexConfig held, and without m_mutex, which the delegate needs to end.
bool ShareAVFCapturer::StopSession() {
    try {
        m_captureSession->stopRunning();
        return true;
    } catch (const platform::NSException& exception) {
        CmTraceError("[ShareAVFCapturer stopRun] catch exception: ", exception.description());
        return false;
    }
}

// ---- What the session tells

void ShareAVFCapturer::runtimeError(const platform::AVCaptureNotification& notification) {
    CmTraceWarning("[ShareAVFCapturer runtimeError] capture session happen runtime error",
                   ", capture session = ", SessionAddress(),
                   notification.userInfo.AVCaptureSessionErrorKey.localizedDescription, ", self = ", this);
}

void ShareAVFCapturer::didStartRunning(const platform::AVCaptureNotification&) {
    CmTraceInfo("[ShareAVFCapturer didStartRunning] capture session has started running, capture session = ",
                SessionAddress());
}

void ShareAVFCapturer::didStopRunning(const platform::AVCaptureNotification&) {
    CmTraceInfo("[ShareAVFCapturer didStopRunning] capture session has stopped running, capture session = ",
                SessionAddress());
}
