// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/av_foundation_delivery.h"
#include "platform/av_foundation_painter.h"
#include "platform/window_server.h"
#include "util/cm_clock.h"
#include "util/cm_thread.h"

#include <chrono>
#include <cstdint>
#include <memory>
#include <optional>

namespace platform {

/// What the pixels of a session's samples depend on, besides the display.
struct SampleLook {
    CGDirectDisplayID display = 0;
    std::chrono::nanoseconds period = std::chrono::nanoseconds(std::chrono::seconds(1)) / 30;
    CGRect crop;
    CGFloat scale = 1.0F;
    bool withPointer = false;
    std::uint32_t format = 0;

    bool operator==(const SampleLook&) const = default;
};

/// What a session is configured to do. Without a connection it does nothing.
struct SamplePlan {
    SampleLook look;
    bool removesDuplicates = true;
    bool discardsLate = true;
    SampleTarget target;

    bool IsConnected() const { return target.connection != nullptr; }
};

/// The session, as its run sees it. Threads: any.
class SampleRunOwner {
public:
    virtual ~SampleRunOwner() = default;
    /// Nothing while it is being configured.
    virtual std::optional<SamplePlan> GetPlan() = 0;
    /// The run has come to an end by itself; its thread does nothing more after this call.
    virtual void OnRunDied(std::uint64_t serial, const NSError& error) = 0;
};

/// One run of a session, from its start to its stop: a thread that takes the display's newest picture each
/// frame duration and makes a sample of it.
/// Lifetime: shared by the session and the thread.
class SampleRun final : public ACmThread {
public:
    SampleRun(std::shared_ptr<SampleRunOwner> owner, std::uint64_t serial);

    std::uint64_t Serial() const { return m_serial; }

    /// Opens the display's stream, if the session is connected. Before the thread is started; an error is
    /// what stands in the way.
    std::optional<NSError> Prepare();

    SampleDelivery& Delivery() { return *m_delivery; }

    int OnThreadRun() override;
    void SetStop() override;

private:
    using Nanoseconds = std::chrono::nanoseconds;

    bool WaitForTick(Nanoseconds due);
    std::optional<NSError> TickGuarded();
    std::optional<NSError> Tick();
    void AdoptPlan();
    PictureOutcome OpenStream(const std::shared_ptr<WindowServer>& server);
    void CloseStream();
    std::optional<NSError> TakePicture(WindowServer& server);
    void OnPicture(WindowServer& server, const PicturePtr& picture, bool isNew);
    bool GiveSample(const PicturePtr& picture, const SampleGeometry& geometry);
    bool GiveSampleOf(const CVPixelBufferRef& image, const Picture& picture);
    bool TellsOther(const Picture& picture) const;
    void GiveLastAgain();

    const std::shared_ptr<SampleRunOwner> m_owner;
    const std::uint64_t m_serial;
    const std::shared_ptr<SampleDelivery> m_delivery = std::make_shared<SampleDelivery>();
    CCmWaitPoint m_point; // for the stop flag

    // Touched by Prepare and then by the thread only.
    const std::shared_ptr<SampleBufferPool> m_pool = std::make_shared<SampleBufferPool>();
    SamplePlan m_plan;
    std::weak_ptr<WindowServer> m_server; // whose stream it is
    std::unique_ptr<DisplayStream> m_stream;
    // The stream comes without the pointer, although it is asked for.
    bool m_drawsPointer = false;
    PicturePtr m_base;                        // what the pointer is drawn on
    std::optional<PointerOnSample> m_pointer; // in the last sample
    CVPixelBufferRef m_image;                 // of the last sample
    CMSampleBufferRef m_last;
};

} // namespace platform
