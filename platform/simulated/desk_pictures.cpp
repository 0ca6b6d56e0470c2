// SPDX-License-Identifier: Apache-2.0
#include "platform/simulated/desk.h"

#include <algorithm>
#include <memory>

/// Pictures of windows.
namespace platform {

namespace {

bool Contains(const std::vector<CGWindowID>& windows, CGWindowID id) {
    return std::find(windows.begin(), windows.end(), id) != windows.end();
}

} // namespace

DesktopPainter::Moment Desk::Now() const {
    const Nanoseconds now = CmSteadyNow();
    const bool stale = Tells(SimulatedLie::StaleStack);
    return {m_desktop, stale ? m_formerWindows : m_desktop.windows, now, now - m_beginning};
}

WindowPictureResult Desk::TakeWindowPicture(const WindowPictureRequest& request, const Lock&) {
    if (const std::optional<PictureOutcome> cannot = CannotTakeWindows(request))
        return {*cannot, nullptr};
    std::vector<CGWindowID> windows = Existing(request.windows);
    if (windows.empty())
        return {PictureOutcome::Gone, nullptr};
    if (Tells(SimulatedLie::OneWindowTooMany))
        windows.push_back(FrontUnlisted(windows));
    auto picture = std::make_shared<WindowPicture>();
    picture->layers = IsAvailable(Capability::Windows) ? WindowLayers(windows, request)
                                                       : DisplayLayers(windows, request.rect);
    picture->time = CmSteadyNow();
    picture->generation = m_generation;
    picture->moment = MomentNow();
    return {PictureOutcome::Ok, std::move(picture)};
}

/// Nothing when it can.
std::optional<PictureOutcome> Desk::CannotTakeWindows(const WindowPictureRequest& request) const {
    const Availability images = AvailabilityOf(Capability::WindowImages);
    if (images == Availability::No)
        return PictureOutcome::Unsupported;
    if (images == Availability::AfterPermission)
        return PictureOutcome::Refused;
    if (AvailabilityOf(Capability::Windows) == Availability::No && request.keepsOut)
        return PictureOutcome::Unsupported;
    return std::nullopt;
}

/// Those that are listed now, each once.
std::vector<CGWindowID> Desk::Existing(const std::vector<CGWindowID>& windows) const {
    std::vector<CGWindowID> existing;
    for (const WindowInfo& window : m_stack) {
        if (Contains(windows, window.id))
            existing.push_back(window.id);
    }
    return existing;
}

/// 0 when there is none.
CGWindowID Desk::FrontUnlisted(const std::vector<CGWindowID>& windows) const {
    const auto found = std::find_if(
        m_desktop.windows.begin(), m_desktop.windows.end(), [&windows](const SimulatedWindow& each) {
            return each.info.onScreen && each.info.sharing != SharingState::None &&
                   each.content.IsPainted() && !Contains(windows, each.info.id);
        });
    return found != m_desktop.windows.end() ? found->info.id : 0;
}

std::vector<PictureLayer> Desk::WindowLayers(const std::vector<CGWindowID>& windows,
                                             const WindowPictureRequest& request) {
    const DesktopPainter::Moment moment = Now();
    const bool withShadow = (request.options & WindowPictureBoundsIgnoreFraming) == 0;
    std::vector<PictureLayer> layers;
    for (auto window = moment.stack.rbegin(); window != moment.stack.rend(); ++window) {
        CGRect place = withShadow ? WithShadow(*window) : window->info.frame;
        if (!Contains(windows, window->info.id) || !Touch(place, request.rect))
            continue;
        if (window->info.sharing == SharingState::None && !Tells(SimulatedLie::UnsharedShown))
            continue;
        PicturePtr picture = m_painter.WindowPicture(moment, *window, withShadow);
        if (picture == nullptr)
            continue;
        if (Tells(SimulatedLie::WrongRectangle))
            place.origin = {place.origin.x + 3, place.origin.y + 2};
        layers.push_back(
            {window->info.id, std::move(picture), place, window->info.alpha, !window->info.onScreen});
    }
    return layers;
}

/// Of a server without windows: its windows are displays as seen.
std::vector<PictureLayer> Desk::DisplayLayers(const std::vector<CGWindowID>& windows, const CGRect& rect) {
    const DesktopPainter::Moment moment = Now();
    std::vector<PictureLayer> layers;
    for (auto window = m_stack.rbegin(); window != m_stack.rend(); ++window) {
        if (!Contains(windows, window->id) || !Touch(window->frame, rect))
            continue;
        for (const SimulatedDisplay& display : m_desktop.displays) {
            if (WindowOfDisplay(display.id) == window->id)
                layers.push_back(
                    {window->id, m_painter.DisplayPicture(moment, display), window->frame, 1.0F, false});
        }
    }
    return layers;
}

/// 0 while something moves by itself, or the next calls are not to be as those before.
std::uint64_t Desk::MomentNow() const {
    const bool stands = m_tellsMoments && m_life.life == Life::Alive && !m_stallEnds &&
                        !m_script.HasPlans() && !NextMotion(CmSteadyNow() - m_beginning);
    return stands ? m_moment : 0;
}

std::uint64_t Desk::GetMoment() const {
    if (InForkedChild())
        return 0;
    const Lock lock = m_point.Acquire();
    return MomentNow();
}

/// Where pictures lag behind, they may still show the stack of a while ago.
std::uint64_t Desk::OldestGenerationShown() const {
    const Nanoseconds then = CmSteadyNow() - m_lag;
    const auto inForce = std::find_if(m_generations.rbegin(), m_generations.rend(),
                                      [then](const auto& each) { return each.first <= then; });
    return inForce != m_generations.rend() ? inForce->second : m_generations.front().second;
}

} // namespace platform
