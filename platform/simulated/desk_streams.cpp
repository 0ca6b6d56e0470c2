// SPDX-License-Identifier: Apache-2.0
#include "platform/simulated/desk.h"

#include <algorithm>
#include <memory>

/// Readers of displays as they are seen.
namespace platform {

namespace {

/// The earlier of two times that may not be there.
std::optional<std::chrono::nanoseconds> Earlier(const std::optional<std::chrono::nanoseconds>& one,
                                                const std::optional<std::chrono::nanoseconds>& other) {
    if (!one || !other)
        return one ? one : other;
    return std::min(*one, *other);
}

} // namespace

PictureOutcome Desk::OpenReader(const DisplayStreamRequest& request, std::shared_ptr<Reader>& opened,
                                const Lock&) {
    const Availability streams = AvailabilityOf(Capability::Streams);
    if (m_life.life != Life::Alive)
        return PictureOutcome::Lost;
    if (streams != Availability::Yes)
        return streams == Availability::No ? PictureOutcome::Unsupported : PictureOutcome::Refused;
    if (!(request.withPointer ? m_withPointer : m_withoutPointer))
        return PictureOutcome::Unsupported;
    if (!IsListed(request.display))
        return PictureOutcome::Gone;
    opened = std::make_shared<Reader>();
    opened->id = ++m_lastReader;
    opened->request = request;
    opened->period = Nanoseconds(std::chrono::seconds(1)) / std::max(request.framesPerSecond, 1U);
    m_readers.push_back(opened);
    Settle();
    return PictureOutcome::Ok;
}

void Desk::Close(const std::shared_ptr<Reader>& reader) {
    if (InForkedChild())
        return;
    const Lock lock = m_point.Acquire();
    m_readers.remove(reader);
    reader->gone = true;
}

DisplayPictureResult Desk::TakeNewest(Reader& reader, Nanoseconds deadline) {
    DisplayPictureResult result;
    const Entry entry = EnterWaiting(SimulatedOperation::TakeNewest, deadline);
    result.outcome = entry.outcome;
    if (!entry.lock.owns_lock())
        return result;
    if (reader.gone)
        result.outcome = PictureOutcome::Gone;
    else if (!entry.Fails())
        result.outcome = TakePicture(reader, result.picture);
    return result;
}

/// The desk answers.
PictureOutcome Desk::TakePicture(Reader& reader, PicturePtr& picture) {
    if (!IsAvailable(Capability::Streams))
        return PictureOutcome::Refused;
    const Nanoseconds now = CmSteadyNow();
    if (reader.took && now < *reader.took + reader.period)
        return PictureOutcome::Nothing;
    SimulatedPixelsPtr newest = FindNew(reader);
    if (newest == nullptr && DisplayOf(reader) != nullptr && !(reader.stacks == StacksNow()))
        newest = reader.pixels;
    if (newest == nullptr) {
        // What the notice was about has gone again; the next one is another.
        reader.told = false;
        m_point.NotifyAll();
        return PictureOutcome::Nothing;
    }
    picture = std::make_shared<const Picture>(MakeStreamPicture(reader, *newest));
    reader.pixels = newest;
    reader.stacks = {picture->generationBefore, picture->generationAfter};
    reader.took = now;
    reader.looked = m_looks;
    reader.lookedElapsed = now - m_beginning;
    reader.told = false;
    m_point.NotifyAll();
    return PictureOutcome::Ok;
}

Picture Desk::MakeStreamPicture(const Reader& reader, const SimulatedPixels& newest) const {
    const SimulatedDisplay& display = *DisplayOf(reader);
    Picture picture =
        MakePicture(newest, {display.format, display.rowGap, display.bounds, display.scale}, CmSteadyNow());
    picture.changed = DifferentRects(reader.pixels != nullptr ? *reader.pixels : SimulatedPixels(), newest);
    if (Tells(SimulatedLie::ChangesForgotten) && !picture.changed.empty())
        picture.changed.pop_back();
    const ShownStacks stacks = StacksNow();
    picture.generationBefore = stacks.before;
    picture.generationAfter = stacks.after;
    return picture;
}

const SimulatedDisplay* Desk::DisplayOf(const Reader& reader) const {
    const auto found =
        std::find_if(m_desktop.displays.begin(), m_desktop.displays.end(),
                     [&reader](const SimulatedDisplay& each) { return each.id == reader.request.display; });
    return found != m_desktop.displays.end() ? &*found : nullptr;
}

bool Desk::IsListed(CGDirectDisplayID display) const {
    return std::any_of(m_displays->begin(), m_displays->end(),
                       [display](const DisplayInfo& each) { return each.id == display; });
}

/// What the reader's display looks like; null when it is gone.
SimulatedPixelsPtr Desk::Look(const Reader& reader) {
    const SimulatedDisplay* const display = DisplayOf(reader);
    if (display == nullptr)
        return nullptr;
    const DesktopPainter::Moment moment = Now();
    Looks& seen = m_seen[{display->id, reader.request.withPointer}];
    const bool holds = seen.pixels != nullptr && seen.looks == m_looks && moment.elapsed >= seen.from &&
                       (!seen.until || moment.elapsed < *seen.until);
    if (!holds) {
        seen.pixels = m_painter.DisplayPixels(moment, *display, reader.request.withPointer);
        seen.looks = m_looks;
        seen.from = moment.elapsed;
        seen.until = NextMotion(moment.elapsed);
    }
    return seen.pixels;
}

/// What its display looks like if that is different from the reader's last picture, else null.
SimulatedPixelsPtr Desk::FindNew(Reader& reader) {
    const Nanoseconds elapsed = CmSteadyNow() - m_beginning;
    const std::optional<Nanoseconds> motion = NextMotion(reader.lookedElapsed);
    if (reader.looked == m_looks && !(motion && *motion <= elapsed))
        return nullptr;
    SimulatedPixelsPtr newest = Look(reader);
    const bool same = newest != nullptr && reader.pixels != nullptr && *newest == *reader.pixels;
    if (newest != nullptr && !same)
        return newest;
    reader.looked = m_looks;
    reader.lookedElapsed = elapsed;
    return nullptr;
}

/// When something moves by itself next.
std::optional<Desk::Nanoseconds> Desk::NextMotion(Nanoseconds elapsed) const {
    std::optional<Nanoseconds> next;
    for (const SimulatedWindow& window : m_desktop.windows) {
        if (window.info.onScreen)
            next = Earlier(next, window.content.NextFrameAfter(elapsed));
    }
    for (const SimulatedDisplay& display : m_desktop.displays)
        next = Earlier(next, display.background.NextFrameAfter(elapsed));
    return next;
}

/// When there may be something to tell a reader; nothing while there can't.
std::optional<Desk::Nanoseconds> Desk::DueTime(const Reader& reader) const {
    if (reader.told || m_receiver == nullptr)
        return std::nullopt;
    std::optional<Nanoseconds> due = m_beginning;
    if (reader.looked == m_looks) {
        due = NextMotion(reader.lookedElapsed);
        if (!due)
            return std::nullopt;
        *due += m_beginning;
    }
    return reader.took ? std::max(*due, *reader.took + reader.period) : *due;
}

std::optional<Desk::Nanoseconds> Desk::NextDue() const {
    std::optional<Nanoseconds> next = m_stallEnds;
    if (m_life.life == Life::Alive) {
        for (const std::shared_ptr<Reader>& reader : m_readers)
            next = Earlier(next, DueTime(*reader));
    }
    return next;
}

/// Also true when its display can't be painted: the reader finds out when it takes its picture, and nobody
/// traces under the lock.
bool Desk::MayFindNew(Reader& reader) {
    try {
        return FindNew(reader) != nullptr;
    } catch (...) {
        return true;
    }
}

/// Tells the readers for which there is something new and time for it.
void Desk::TellReaders() {
    if (m_life.life != Life::Alive)
        return;
    const Nanoseconds now = CmSteadyNow();
    for (const std::shared_ptr<Reader>& reader : m_readers) {
        const std::optional<Nanoseconds> due = DueTime(*reader);
        if (!due || now < *due)
            continue;
        if (!MayFindNew(*reader))
            continue;
        Notice notice;
        notice.kind = NoticeKind::StreamPicture;
        notice.stream = reader->id;
        Tell(notice);
        reader->told = true;
    }
}

/// The readers of displays that aren't there any more have read their last picture.
void Desk::EndReaders() {
    for (const std::shared_ptr<Reader>& reader : m_readers)
        reader->gone = !IsListed(reader->request.display);
    m_readers.remove_if([](const std::shared_ptr<Reader>& each) { return each->gone; });
}

} // namespace platform
