// SPDX-License-Identifier: Apache-2.0
#include "platform/av_foundation.h"

#include "platform/av_foundation_core.h"
#include "platform/av_foundation_script.h"
#include "platform/notices.h"
#include "util/cm_guarded_call.h"

#include <algorithm>
#include <new>

namespace platform {

namespace {

using Guard = std::lock_guard<std::mutex>;

bool IsListed(CGDirectDisplayID display) {
    const std::shared_ptr<const DisplayList> displays = WindowServerInUse()->GetDisplays();
    return std::any_of(displays->begin(), displays->end(),
                       [display](const DisplayInfo& each) { return each.id == display; });
}

bool IsKnownFormat(std::uint32_t format) {
    return format == kCVPixelFormatType_32ARGB || format == kCVPixelFormatType_32RGBA;
}

} // namespace

// ---- Input

std::shared_ptr<AVCaptureScreenInput> AVCaptureScreenInput::initWithDisplayID(
    CGDirectDisplayID display) noexcept {
    std::shared_ptr<AVCaptureScreenInput> input;
    if (AVCaptureScriptFails(AVCaptureOperation::ScreenInputInit))
        return input;
    CmCallGuarded("[AVCaptureScreenInput::initWithDisplayID]>>exception: ", [&] {
        if (IsListed(display))
            input = std::make_shared<AVCaptureScreenInput>(display);
    });
    return input;
}

void AVCaptureScreenInput::setMinFrameDuration(const CMTime& duration) noexcept {
    const Guard lock(m_mutex);
    m_minFrameDuration = duration;
}

CMTime AVCaptureScreenInput::minFrameDuration() const noexcept {
    const Guard lock(m_mutex);
    return m_minFrameDuration;
}

void AVCaptureScreenInput::setRemovesDuplicateFrames(bool removes) noexcept {
    const Guard lock(m_mutex);
    m_removesDuplicateFrames = removes;
}

bool AVCaptureScreenInput::removesDuplicateFrames() const noexcept {
    const Guard lock(m_mutex);
    return m_removesDuplicateFrames;
}

void AVCaptureScreenInput::setCapturesCursor(bool captures) noexcept {
    const Guard lock(m_mutex);
    m_capturesCursor = captures;
}

bool AVCaptureScreenInput::capturesCursor() const noexcept {
    const Guard lock(m_mutex);
    return m_capturesCursor;
}

void AVCaptureScreenInput::setScaleFactor(CGFloat factor) noexcept {
    if (factor != factor)
        return;
    const Guard lock(m_mutex);
    m_scaleFactor = std::clamp(factor, SMALLEST_SCALE_FACTOR, 1.0F);
}

CGFloat AVCaptureScreenInput::scaleFactor() const noexcept {
    const Guard lock(m_mutex);
    return m_scaleFactor;
}

void AVCaptureScreenInput::setCropRect(const CGRect& rect) noexcept {
    const Guard lock(m_mutex);
    m_cropRect = rect;
}

CGRect AVCaptureScreenInput::cropRect() const noexcept {
    const Guard lock(m_mutex);
    return m_cropRect;
}

// ---- Connection

bool AVCaptureConnection::isVideoMinFrameDurationSupported() const noexcept {
    return !AVCaptureScriptFails(AVCaptureOperation::IsVideoMinFrameDurationSupported);
}

void AVCaptureConnection::setVideoMinFrameDuration(const CMTime& duration) noexcept {
    const Guard lock(m_mutex);
    m_minFrameDuration = duration;
}

CMTime AVCaptureConnection::videoMinFrameDuration() const noexcept {
    const Guard lock(m_mutex);
    return m_minFrameDuration;
}

bool AVCaptureConnection::isVideoMaxFrameDurationSupported() const noexcept {
    return !AVCaptureScriptFails(AVCaptureOperation::IsVideoMaxFrameDurationSupported);
}

void AVCaptureConnection::setVideoMaxFrameDuration(const CMTime& duration) noexcept {
    const Guard lock(m_mutex);
    m_maxFrameDuration = duration;
}

CMTime AVCaptureConnection::videoMaxFrameDuration() const noexcept {
    const Guard lock(m_mutex);
    return m_maxFrameDuration;
}

// ---- Output

std::shared_ptr<AVCaptureVideoDataOutput> AVCaptureVideoDataOutput::init() noexcept {
    std::shared_ptr<AVCaptureVideoDataOutput> output;
    if (AVCaptureScriptFails(AVCaptureOperation::VideoDataOutputInit))
        return output;
    CmCallGuarded("[AVCaptureVideoDataOutput::init]>>exception: ",
                  [&] { output = std::make_shared<AVCaptureVideoDataOutput>(); });
    return output;
}

AVCaptureVideoDataOutput::AVCaptureVideoDataOutput() : m_pixelFormat(kCVPixelFormatType_32RGBA) {}

void AVCaptureVideoDataOutput::setSampleBufferDelegate(
    std::weak_ptr<AVCaptureVideoDataOutputSampleBufferDelegate> delegate, dispatch_queue_t queue) noexcept {
    Delivery delivery{std::move(delegate), std::move(queue)};
    const Guard lock(m_mutex);
    std::swap(m_delivery, delivery); // the former one ends behind the lock
}

AVCaptureVideoDataOutput::Delivery AVCaptureVideoDataOutput::GetDelivery() const {
    const Guard lock(m_mutex);
    return m_delivery;
}

void AVCaptureVideoDataOutput::setVideoSettings(const std::optional<AVVideoSettings>& settings) noexcept {
    std::uint32_t format = kCVPixelFormatType_32RGBA;
    if (settings) {
        const auto found = settings->find(kCVPixelBufferPixelFormatTypeKey);
        if (found == settings->end() || !IsKnownFormat(found->second))
            return;
        format = found->second;
    }
    const Guard lock(m_mutex);
    m_pixelFormat = format;
}

AVVideoSettings AVCaptureVideoDataOutput::videoSettings() const noexcept {
    AVVideoSettings settings;
    CmCallGuarded("[AVCaptureVideoDataOutput::videoSettings]>>exception: ",
                  [&] { settings[kCVPixelBufferPixelFormatTypeKey] = PixelFormat(); });
    return settings;
}

std::uint32_t AVCaptureVideoDataOutput::PixelFormat() const {
    const Guard lock(m_mutex);
    return m_pixelFormat;
}

void AVCaptureVideoDataOutput::setAlwaysDiscardsLateVideoFrames(bool discards) noexcept {
    const Guard lock(m_mutex);
    m_discardsLate = discards;
}

bool AVCaptureVideoDataOutput::alwaysDiscardsLateVideoFrames() const noexcept {
    const Guard lock(m_mutex);
    return m_discardsLate;
}

std::vector<std::shared_ptr<AVCaptureConnection>> AVCaptureVideoDataOutput::connections() const noexcept {
    std::vector<std::shared_ptr<AVCaptureConnection>> connections;
    CmCallGuarded("[AVCaptureVideoDataOutput::connections]>>exception: ", [&] {
        const Guard lock(m_mutex);
        if (m_connection != nullptr)
            connections.push_back(m_connection);
    });
    return connections;
}

void AVCaptureVideoDataOutput::SetConnection(std::shared_ptr<AVCaptureConnection> connection) {
    const Guard lock(m_mutex);
    m_connection = std::move(connection);
}

// ---- Session

std::shared_ptr<AVCaptureSession> AVCaptureSession::init() noexcept {
    std::shared_ptr<AVCaptureSession> session;
    if (AVCaptureScriptFails(AVCaptureOperation::SessionInit))
        return session;
    CmCallGuarded("[AVCaptureSession::init]>>exception: ", [&] {
        const auto core = std::make_shared<CaptureSessionCore>();
        CaptureSessionList::Get().Add(core);
        session = std::make_shared<AVCaptureSession>(core);
    });
    return session;
}

AVCaptureSession::AVCaptureSession(std::shared_ptr<CaptureSessionCore> core) : m_core(std::move(core)) {}

AVCaptureSession::~AVCaptureSession() {
    m_core->End();
}

void AVCaptureSession::beginConfiguration() noexcept {
    m_core->BeginConfiguration();
}

void AVCaptureSession::commitConfiguration() noexcept {
    m_core->CommitConfiguration();
}

bool AVCaptureSession::canAddInput(const std::shared_ptr<AVCaptureScreenInput>& input) const noexcept {
    return !AVCaptureScriptFails(AVCaptureOperation::CanAddInput) && m_core->CanAdd(input);
}

bool AVCaptureSession::canAddOutput(const std::shared_ptr<AVCaptureVideoDataOutput>& output) const noexcept {
    return !AVCaptureScriptFails(AVCaptureOperation::CanAddOutput) && m_core->CanAdd(output);
}

void AVCaptureSession::addInput(const std::shared_ptr<AVCaptureScreenInput>& input) noexcept {
    CmCallGuarded("[AVCaptureSession::addInput]>>exception: ", [&] { m_core->Add(input); });
}

void AVCaptureSession::removeInput(const std::shared_ptr<AVCaptureScreenInput>& input) noexcept {
    m_core->Remove(input);
}

void AVCaptureSession::addOutput(const std::shared_ptr<AVCaptureVideoDataOutput>& output) noexcept {
    CmCallGuarded("[AVCaptureSession::addOutput]>>exception: ", [&] { m_core->Add(output); });
}

void AVCaptureSession::removeOutput(const std::shared_ptr<AVCaptureVideoDataOutput>& output) noexcept {
    m_core->Remove(output);
}

void AVCaptureSession::startRunning() {
    if (AVCaptureScriptFails(AVCaptureOperation::StartRunning))
        return;
    if (m_core->IsBeingConfigured())
        throw NSException("NSGenericException", "startRunning was called before commitConfiguration.");
    m_core->Start();
}

void AVCaptureSession::stopRunning() {
    if (AVCaptureScriptFails(AVCaptureOperation::StopRunning))
        return;
    m_core->Stop();
}

bool AVCaptureSession::isRunning() const noexcept {
    return m_core->IsRunning();
}

} // namespace platform
