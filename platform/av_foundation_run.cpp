// SPDX-License-Identifier: Apache-2.0
#include "platform/av_foundation_run.h"

#include "platform/notices.h"
#include "platform/platform_thread.h"
#include "util/cm_guarded_call.h"

#include <algorithm>
#include <utility>

namespace platform {

namespace {

using std::chrono::nanoseconds;

/// The ticks are in phase with the first one; those that were missed are left out. One that is due right now
/// wasn't missed.
nanoseconds NextTick(nanoseconds last, nanoseconds period, nanoseconds now) {
    const nanoseconds next = last + period;
    return next >= now ? next : next + (now - next + period - nanoseconds(1)) / period * period;
}

/// The run paces itself. A stream that counted the same time would now and then find a tick a little early,
/// and leave out a picture.
unsigned StreamRate(nanoseconds period) {
    const nanoseconds second = std::chrono::seconds(1);
    return static_cast<unsigned>(std::max<nanoseconds::rep>((second + period - nanoseconds(1)) / period, 1)) *
           2;
}

NSError ErrorOf(PictureOutcome outcome) {
    switch (outcome) {
        case PictureOutcome::Gone:
            return {"The display is not there any more."};
        case PictureOutcome::Lost:
            return {"The window server is lost."};
        case PictureOutcome::Refused:
            return {"Capturing the display is not permitted."};
        case PictureOutcome::Unsupported:
            return {"The display can not be captured in this way."};
        default:
            return {"The display could not be captured."};
    }
}

/// One that asking again doesn't help against.
bool IsFinal(PictureOutcome outcome, const WindowServer& server) {
    switch (outcome) {
        case PictureOutcome::Lost:
            return server.GetLife().life == Life::Lost;
        case PictureOutcome::Gone:
        case PictureOutcome::Unsupported:
        case PictureOutcome::Refused:
            return true;
        default:
            return false;
    }
}

} // namespace

SampleRun::SampleRun(std::shared_ptr<SampleRunOwner> owner, std::uint64_t serial)
    : m_owner(std::move(owner)),
      m_serial(serial) {}

std::optional<NSError> SampleRun::Prepare() {
    AdoptPlan();
    if (!m_plan.IsConnected())
        return std::nullopt;
    const PictureOutcome outcome = OpenStream(WindowServerInUse());
    return outcome == PictureOutcome::Ok ? std::nullopt : std::optional<NSError>(ErrorOf(outcome));
}

int SampleRun::OnThreadRun() {
    const PlatformThreadScope scope(this);
    const InsideSessionScope inside;
    std::optional<NSError> error;
    nanoseconds due = CmSteadyNow();
    while (!error && WaitForTick(due)) {
        error = TickGuarded();
        due = NextTick(due, m_plan.look.period, CmSteadyNow());
    }
    CloseStream();
    m_plan = {}; // whoever still holds the run holds nothing of its clients
    if (error)
        m_owner->OnRunDied(m_serial, *error);
    return 0;
}

void SampleRun::SetStop() {
    ACmThread::SetStop();
    // A thread that has not seen its stop flag yet holds the mutex until it sleeps.
    { const CCmWaitPoint::Lock lock = m_point.Acquire(); }
    m_point.NotifyAll();
}

/// False when the run is to end.
bool SampleRun::WaitForTick(Nanoseconds due) {
    CCmWaitPoint::Lock lock = m_point.Acquire();
    while (!GetStopFlag() && CmSteadyNow() < due)
        m_point.WaitUntil(lock, due);
    return !GetStopFlag();
}

std::optional<NSError> SampleRun::TickGuarded() {
    std::optional<NSError> error;
    const bool done = CmCallGuarded("[SampleRun::TickGuarded]>>exception: ", [&] { error = Tick(); });
    // The stream counts what it gave as seen: only another one shows it again.
    if (!done)
        CloseStream();
    return error;
}

std::optional<NSError> SampleRun::Tick() {
    AdoptPlan();
    if (!m_plan.IsConnected())
        return std::nullopt;
    const std::shared_ptr<WindowServer> server = WindowServerInUse();
    if (m_server.lock() != server)
        CloseStream();
    if (m_stream == nullptr) {
        const PictureOutcome outcome = OpenStream(server);
        if (outcome != PictureOutcome::Ok)
            return IsFinal(outcome, *server) ? std::optional<NSError>(ErrorOf(outcome)) : std::nullopt;
    }
    return TakePicture(*server);
}

/// A look that has changed needs a whole picture, even if the display stands still: a new stream's first one.
void SampleRun::AdoptPlan() {
    std::optional<SamplePlan> plan = m_owner->GetPlan();
    if (!plan)
        return;
    if (!plan->IsConnected() || plan->look != m_plan.look)
        CloseStream();
    m_plan = std::move(*plan);
}

PictureOutcome SampleRun::OpenStream(const std::shared_ptr<WindowServer>& server) {
    DisplayStreamRequest request;
    request.display = m_plan.look.display;
    request.framesPerSecond = StreamRate(m_plan.look.period);
    request.withPointer = m_plan.look.withPointer;
    DisplayStreamResult result = server->OpenDisplayStream(request);
    m_drawsPointer = request.withPointer && result.outcome == PictureOutcome::Unsupported;
    if (m_drawsPointer) {
        request.withPointer = false;
        result = server->OpenDisplayStream(request);
    }
    m_stream = std::move(result.stream);
    m_server = server;
    return result.outcome;
}

void SampleRun::CloseStream() {
    m_stream = nullptr;
    m_base = nullptr;
    m_pointer.reset();
    m_image = nullptr;
    m_last = nullptr;
}

std::optional<NSError> SampleRun::TakePicture(WindowServer& server) {
    // What is taken from the stream is not given again: without room it stays there.
    if (!m_pool->HasBlock())
        return std::nullopt;
    DisplayPictureResult result = m_stream->TakeNewest(CmSteadyNow() + DEFAULT_IMAGE_DEADLINE);
    switch (result.outcome) {
        case PictureOutcome::Ok:
            if (m_drawsPointer)
                m_base = result.picture;
            OnPicture(server, result.picture, true);
            return std::nullopt;
        case PictureOutcome::Nothing:
            if (m_base != nullptr)
                OnPicture(server, m_base, false);
            else
                GiveLastAgain();
            return std::nullopt;
        default:
            return IsFinal(result.outcome, server) ? std::optional<NSError>(ErrorOf(result.outcome))
                                                   : std::nullopt;
    }
}

/// `isNew` tells a picture that the stream has just given from one that was shown before.
void SampleRun::OnPicture(WindowServer& server, const PicturePtr& picture, bool isNew) {
    const std::optional<SampleGeometry> geometry =
        GeometryOfSample(*picture, m_plan.look.crop, m_plan.look.scale);
    if (!geometry)
        return;
    std::optional<PointerOnSample> pointer;
    if (m_drawsPointer)
        pointer = FindPointer(server, *picture, *geometry);
    const bool hasChanged = isNew && ShowsChange(*picture, geometry->part);
    bool given = true;
    if (hasChanged || pointer != m_pointer) {
        m_pointer = std::move(pointer);
        given = GiveSample(picture, *geometry);
    } else if (TellsOther(*picture)) {
        given = GiveSampleOf(m_image, *picture);
    } else {
        GiveLastAgain();
    }
    if (!given)
        CloseStream(); // the next one's first picture is whole again
}

bool SampleRun::GiveSample(const PicturePtr& picture, const SampleGeometry& geometry) {
    const auto width = static_cast<std::size_t>(geometry.width);
    const auto height = static_cast<std::size_t>(geometry.height);
    const std::shared_ptr<std::uint8_t> pixels = m_pool->Take(width * 4 * height);
    if (pixels == nullptr || !PaintSample(picture, geometry, m_pointer, m_plan.look.format, pixels.get()))
        return false;
    const CVPixelBufferRef image =
        CVPixelBufferCreateWithBytes(width, height, m_plan.look.format, width * 4, pixels);
    return image != nullptr && GiveSampleOf(image, *picture);
}

bool SampleRun::GiveSampleOf(const CVPixelBufferRef& image, const Picture& picture) {
    const CMSampleBufferRef sample =
        CMSampleBufferCreate(image, {picture.generationBefore, picture.generationAfter}, picture.rect);
    if (sample == nullptr)
        return false;
    if (image == m_image)
        m_delivery->DeliverInstead(m_last, m_plan.target, sample, m_plan.discardsLate);
    else
        m_delivery->Deliver(m_plan.target, sample, m_plan.discardsLate);
    m_image = image;
    m_last = sample;
    return true;
}

/// The last sample has the pixels of this picture, and yet not what else there is to tell of it.
bool SampleRun::TellsOther(const Picture& picture) const {
    const CMSampleBufferGenerations generations{picture.generationBefore, picture.generationAfter};
    return m_last != nullptr && !(CMSampleBufferGetGenerations(m_last.get()) == generations &&
                                  CMSampleBufferGetDisplayRect(m_last.get()) == picture.rect);
}

/// One that waits still tells as much as a copy of it would.
void SampleRun::GiveLastAgain() {
    if (!m_plan.removesDuplicates && m_last != nullptr && !m_delivery->HasWaiting())
        m_delivery->Deliver(m_plan.target, m_last, m_plan.discardsLate);
}

} // namespace platform
