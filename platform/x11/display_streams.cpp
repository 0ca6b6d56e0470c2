// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/display_streams.h"

#include "platform/x11/display_frame.h"
#include "platform/x11/drawn_pointer.h"
#include "platform/x11/root_damage.h"
#include "util/cm_clock.h"
#include "util/cm_numeric.h"
#include "util/cm_trace.h"

#include <algorithm>
#include <cstddef>
#include <cstring>
#include <map>
#include <utility>
#include <vector>

namespace platform::x11 {

namespace {

using Nanoseconds = std::chrono::nanoseconds;
using FramePtr = std::shared_ptr<DisplayFrame>;

/// A picture that changed in more places than that tells one rectangle around them.
constexpr std::size_t MOST_CHANGES = 256;

Nanoseconds PeriodOf(const StreamReader& reader) {
    return Nanoseconds(std::chrono::seconds(1)) / std::max(reader.request.framesPerSecond, 1U);
}

const DisplayInfo* Find(const DisplayList& displays, CGDirectDisplayID id) {
    const auto found = std::find_if(displays.begin(), displays.end(),
                                    [id](const DisplayInfo& each) { return each.id == id; });
    return found != displays.end() ? &*found : nullptr;
}

/// Where a display is in the root, and there.
PixelRect PlaceOf(const CGRect& bounds, const CGPoint& origin, const PixelRect& root) {
    const int left = CmTruncate(bounds.origin.x + origin.x);
    const int top = CmTruncate(bounds.origin.y + origin.y);
    return {std::max(left, 0), std::max(top, 0), std::min(left + CmTruncate(bounds.size.width), root.right),
            std::min(top + CmTruncate(bounds.size.height), root.bottom)};
}

bool IsInside(const PixelRect& one, const PixelRect& other) {
    return one.left >= other.left && one.top >= other.top && one.right <= other.right &&
           one.bottom <= other.bottom;
}

std::vector<PixelRect> RectsOf(const PixelRegion& region) {
    std::vector<PixelRect> rects = region.Rects();
    if (rects.size() > MOST_CHANGES)
        rects = {region.Bounds()};
    return rects;
}

} // namespace

struct StreamReader::Place {
    PixelRegion changed; // since its last picture, in pixels of it
    bool whole = true;   // all of it has
    bool pointerChanged = false;
    std::optional<Nanoseconds> looked;         // when it was last looked for something new
    DrawnPointer pointer;                      // in its last picture
    std::shared_ptr<const CursorImage> cursor; // at its last picture
    std::optional<Sheets> canvases;            // its pictures, where they aren't the display's own
    ShownStacks stacks;                        // of its last picture

    bool HasNews() const { return whole || !changed.IsEmpty(); }
};

struct DisplayStreams::State {
    explicit State(X11Connection& theConnection)
        : connection(theConnection),
          pool(theConnection),
          damage(theConnection) {}
    ~State() {
        for (const StreamReaderPtr& reader : readers)
            reader->place.reset();
    }
    State(const State&) = delete;
    State& operator=(const State&) = delete;

    std::optional<Nanoseconds> DueTime(const StreamReader& reader) const;
    void Collect();
    void Spread(const PixelRegion& ofRoot);
    FramePtr FrameOf(const DisplayInfo& display, const CGPoint& origin);
    void BeginAnew(CGDirectDisplayID display);
    PictureOutcome Refresh(DisplayFrame& frame, const StreamMoment& moment, bool collected,
                           PixelRegion& late);
    void NotePointer(StreamReader::Place& place, const DisplayFrame& frame, const StreamMoment& moment);
    bool DrawCanvas(StreamReader::Place& place, const PixelRegion& changed, Picture& picture);
    DisplayPictureResult MakePicture(StreamReader::Place& place, const FramePtr& frame,
                                     const PixelRegion& late, bool withPointer);
    bool PointerHasMoved(const StreamReader& reader, const std::optional<CGPoint>& pointer) const;
    std::optional<CGPoint> AskPointer();
    void TellFailure(CGDirectDisplayID display);

    X11Connection& connection;
    SharedPixelsPool pool;
    RootDamage damage;
    std::vector<StreamReaderPtr> readers;
    std::map<CGDirectDisplayID, FramePtr> frames;
    bool toldFailure = false;
};

/// Time zero is now, too.
std::optional<Nanoseconds> DisplayStreams::State::DueTime(const StreamReader& reader) const {
    if (reader.told || reader.gone)
        return std::nullopt;
    const StreamReader::Place& place = *reader.place;
    const bool certain = place.HasNews() || place.pointerChanged;
    // Nobody tells when the pointer moves.
    if (!certain && !damage.IsDue() && !reader.request.withPointer)
        return std::nullopt;
    Nanoseconds due{0};
    if (reader.took)
        due = *reader.took + PeriodOf(reader);
    if (!certain && place.looked)
        due = std::max(due, *place.looked + PeriodOf(reader));
    return due;
}

void DisplayStreams::State::Collect() {
    RootDamage::Question question = damage.Ask();
    Spread(damage.Await(question));
}

void DisplayStreams::State::Spread(const PixelRegion& ofRoot) {
    if (ofRoot.IsEmpty())
        return;
    for (const auto& [id, frame] : frames)
        frame->AddStale(frame->PartOf(ofRoot));
    for (const StreamReaderPtr& reader : readers) {
        const auto frame = frames.find(reader->request.display);
        if (!reader->place->whole && frame != frames.end())
            reader->place->changed.Add(frame->second->PartOf(ofRoot));
    }
}

/// Null when nothing of it is in the root, as for a moment between two layouts.
FramePtr DisplayStreams::State::FrameOf(const DisplayInfo& display, const CGPoint& origin) {
    const PixelRect place = PlaceOf(display.bounds, origin, damage.Root());
    const auto known = frames.find(display.id);
    if (known != frames.end() && known->second->Place() == place && known->second->Bounds() == display.bounds)
        return known->second;
    BeginAnew(display.id);
    if (place.left >= place.right || place.top >= place.bottom)
        return nullptr;
    FramePtr frame = std::make_shared<DisplayFrame>(connection, pool, place, display.bounds);
    frames.emplace(display.id, frame);
    return frame;
}

void DisplayStreams::State::BeginAnew(CGDirectDisplayID display) {
    frames.erase(display);
    for (const StreamReaderPtr& reader : readers) {
        if (reader->request.display == display)
            reader->place = std::make_shared<StreamReader::Place>();
    }
}

/// Has the frame show the screen of now, and say so. What has been painted while it was fetched is `late`: it
/// may be in the picture, or not yet, so it is new for this picture and for the next one. Nobody is asked
/// while nothing was painted and the stack is the one that it shows.
PictureOutcome DisplayStreams::State::Refresh(DisplayFrame& frame, const StreamMoment& moment, bool collected,
                                              PixelRegion& late) {
    const ShownStacks now{moment.generationBefore, moment.generation};
    // The stack has changed since it was fetched, or has been seen by now, so its damage may be on its way.
    if (!collected && !frame.IsStale() && !(frame.Stacks() == now)) {
        Collect();
        collected = true;
    }
    const Nanoseconds time = CmSteadyNow();
    if (frame.IsStale()) {
        if (!frame.Ask())
            return PictureOutcome::Failed;
        RootDamage::Question question = damage.Ask();
        const bool done = frame.Finish();
        late = damage.Await(question);
        Spread(late);
        if (!done)
            return IsInside(frame.Place(), damage.Root()) ? PictureOutcome::Failed : PictureOutcome::Nothing;
    } else if (!collected) {
        return PictureOutcome::Ok;
    }
    frame.Stamp(time, {moment.generationBefore, moment.generationAfter()});
    return PictureOutcome::Ok;
}

void DisplayStreams::State::NotePointer(StreamReader::Place& place, const DisplayFrame& frame,
                                        const StreamMoment& moment) {
    place.pointerChanged = false;
    place.cursor = moment.cursor;
    DrawnPointer now = PointerIn(frame.Place(), moment.pointer, moment.cursor);
    if (now == place.pointer)
        return;
    PixelRegion touched(place.pointer.rect);
    touched.Add(now.rect);
    touched.Intersect(frame.Whole());
    place.changed.Add(touched);
    place.pointer = std::move(now);
}

/// The display's picture with the pointer in it, in memory of the reader's own.
bool DisplayStreams::State::DrawCanvas(StreamReader::Place& place, const PixelRegion& changed,
                                       Picture& picture) {
    if (!place.canvases)
        place.canvases.emplace(pool, picture.width, picture.height);
    place.canvases->AddStale(changed);
    if (changed.IsEmpty() && place.canvases->Newest() != nullptr) {
        picture.pixels = place.canvases->Newest()->Bytes();
        picture.memory = place.canvases->Newest()->share;
        return true;
    }
    Sheets::Sheet* const canvas = place.canvases->Choose();
    if (canvas == nullptr)
        return false;
    // It is drawn anew, and not over itself.
    PixelRegion pointer(place.pointer.rect);
    pointer.Intersect({0, 0, picture.width, picture.height});
    canvas->behind.Add(pointer);
    for (const PixelRect& rect : canvas->behind.Rects()) {
        for (int y = rect.top; y < rect.bottom; ++y) {
            const std::size_t offset =
                static_cast<std::size_t>(y) * picture.stride + static_cast<std::size_t>(rect.left) * 4;
            std::memcpy(canvas->Bytes() + offset, picture.pixels + offset,
                        static_cast<std::size_t>(rect.right - rect.left) * 4);
        }
    }
    DrawPointer(place.pointer, picture, canvas->Bytes());
    place.canvases->SetNewest(canvas);
    picture.pixels = canvas->Bytes();
    picture.memory = canvas->share;
    return true;
}

DisplayPictureResult DisplayStreams::State::MakePicture(StreamReader::Place& place, const FramePtr& frame,
                                                        const PixelRegion& late, bool withPointer) {
    const PixelRegion changed = place.whole ? PixelRegion(frame->Whole()) : place.changed;
    Picture picture = frame->Show();
    picture.changed = RectsOf(changed);
    if (withPointer && !DrawCanvas(place, changed, picture))
        return {PictureOutcome::Failed, nullptr};
    DisplayPictureResult result{PictureOutcome::Ok, std::make_shared<const Picture>(std::move(picture))};
    place.changed = frame->PartOf(late);
    place.whole = false;
    place.stacks = frame->Stacks();
    return result;
}

bool DisplayStreams::State::PointerHasMoved(const StreamReader& reader,
                                            const std::optional<CGPoint>& pointer) const {
    const auto frame = frames.find(reader.request.display);
    if (frame == frames.end())
        return false;
    return !(PointerIn(frame->second->Place(), pointer, reader.place->cursor) == reader.place->pointer);
}

std::optional<CGPoint> DisplayStreams::State::AskPointer() {
    const auto reply =
        connection.Fetch<xcb_query_pointer_reply_t>(xcb_query_pointer(connection.Get(), connection.Root()));
    if (reply == nullptr || reply->same_screen == 0)
        return std::nullopt;
    return CGPoint{static_cast<float>(reply->root_x), static_cast<float>(reply->root_y)};
}

void DisplayStreams::State::TellFailure(CGDirectDisplayID display) {
    if (!std::exchange(toldFailure, true))
        CmTraceError("[DisplayStreams::Take]>>can't fetch the screen's pixels, display=", display);
}

DisplayStreams::DisplayStreams(X11Connection& connection) : m_state(std::make_unique<State>(connection)) {}

DisplayStreams::~DisplayStreams() = default;

void DisplayStreams::Attach(const StreamReaderPtr& reader) {
    if (m_state->readers.empty())
        m_state->damage.Start();
    reader->place = std::make_shared<StreamReader::Place>();
    reader->told = false;
    m_state->readers.push_back(reader);
}

void DisplayStreams::Detach(const StreamReaderPtr& reader) {
    std::vector<StreamReaderPtr>& readers = m_state->readers;
    readers.erase(std::remove(readers.begin(), readers.end(), reader), readers.end());
    reader->place.reset();
    const bool isLast = std::none_of(readers.begin(), readers.end(), [&](const StreamReaderPtr& other) {
        return other->request.display == reader->request.display;
    });
    if (isLast)
        m_state->frames.erase(reader->request.display);
    if (readers.empty())
        m_state->damage.Stop();
}

void DisplayStreams::OnDisplaysChanged(const DisplayList& displays) {
    const std::vector<StreamReaderPtr> readers = m_state->readers;
    for (const StreamReaderPtr& reader : readers) {
        const DisplayInfo* const display = Find(displays, reader->request.display);
        if (display == nullptr) {
            reader->gone = true;
            Detach(reader);
            continue;
        }
        const auto frame = m_state->frames.find(display->id);
        if (frame != m_state->frames.end() && !(frame->second->Bounds() == display->bounds))
            m_state->BeginAnew(display->id);
    }
}

void DisplayStreams::OnPointerChanged() {
    for (const StreamReaderPtr& reader : m_state->readers)
        reader->place->pointerChanged = reader->request.withPointer;
}

bool DisplayStreams::OnEvent(const xcb_generic_event_t& event) {
    return m_state->damage.OnEvent(event);
}

std::optional<Nanoseconds> DisplayStreams::NextDue() const {
    std::optional<Nanoseconds> next;
    for (const StreamReaderPtr& reader : m_state->readers) {
        const std::optional<Nanoseconds> due = m_state->DueTime(*reader);
        if (due && (!next || *due < *next))
            next = due;
    }
    return next;
}

void DisplayStreams::DoDue(const std::function<void(std::uint64_t stream)>& tell) {
    State& state = *m_state;
    const Nanoseconds now = CmSteadyNow();
    std::vector<StreamReaderPtr> due;
    for (const StreamReaderPtr& reader : state.readers) {
        const std::optional<Nanoseconds> time = state.DueTime(*reader);
        if (time && *time <= now)
            due.push_back(reader);
    }
    const auto lacksNews = [](const StreamReaderPtr& reader) { return !reader->place->HasNews(); };
    if (state.damage.IsDue() && std::any_of(due.begin(), due.end(), lacksNews))
        state.Collect();
    const bool asksPointer = std::any_of(due.begin(), due.end(), [&](const StreamReaderPtr& reader) {
        return reader->request.withPointer && lacksNews(reader);
    });
    const std::optional<CGPoint> pointer = asksPointer ? state.AskPointer() : std::nullopt;
    for (const StreamReaderPtr& reader : due) {
        StreamReader::Place& place = *reader->place;
        place.looked = now;
        const bool pointerMoved =
            reader->request.withPointer && asksPointer && state.PointerHasMoved(*reader, pointer);
        if (!place.HasNews() && !place.pointerChanged && !pointerMoved)
            continue;
        reader->told = true;
        tell(reader->id);
    }
}

DisplayPictureResult DisplayStreams::Take(StreamReader& reader, const StreamMoment& moment) {
    const DisplayInfo* const display = Find(*moment.displays, reader.request.display);
    reader.gone = reader.gone || display == nullptr;
    if (reader.gone || reader.place == nullptr)
        return {PictureOutcome::Gone, nullptr};
    const Nanoseconds now = CmSteadyNow();
    if (reader.took && now < *reader.took + PeriodOf(reader))
        return {PictureOutcome::Nothing, nullptr};
    reader.told = false;
    const bool collected = m_state->damage.IsDue();
    if (collected)
        m_state->Collect();
    const FramePtr frame = m_state->FrameOf(*display, moment.origin);
    if (frame == nullptr)
        return {PictureOutcome::Nothing, nullptr};
    const std::shared_ptr<StreamReader::Place> place = reader.place; // a new one for a new frame
    if (reader.request.withPointer)
        m_state->NotePointer(*place, *frame, moment);
    PixelRegion late;
    DisplayPictureResult result;
    result.outcome = m_state->Refresh(*frame, moment, collected, late);
    if (result.outcome == PictureOutcome::Ok && !place->HasNews() && place->stacks == frame->Stacks())
        return {PictureOutcome::Nothing, nullptr};
    if (result.outcome == PictureOutcome::Ok)
        result = m_state->MakePicture(*place, frame, late, reader.request.withPointer);
    if (result.outcome == PictureOutcome::Ok)
        reader.took = now;
    else if (result.outcome == PictureOutcome::Failed)
        m_state->TellFailure(reader.request.display);
    return result;
}

void DisplayStreams::Drop(Nanoseconds before) {
    for (const auto& [id, frame] : m_state->frames)
        frame->Drop(before);
    m_state->pool.Drop(before);
}

} // namespace platform::x11
