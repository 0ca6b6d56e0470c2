// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_services.h"
#include "src/share_capturer_context.h"

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <vector>

/// The context that looks at the desktop: it walks the window server's list and finds out what a viewer may
/// see.
///
/// Walk:    from the back of the stack to the front each window is judged. A kept one is added to what is
///          visible; any other takes what it covers away from it, and what was taken is overlap: shared, but
///          hidden.
/// Rest:    what a walk has found stands, and no window is looked at again, until something that it went by
///          is another (WalkInputs). While lines are traced at DEBUG every walk is made, as they tell of it.
/// Threads: those of the base; one walk at a time. A walk holds no lock while it looks at windows, so a list
///          change may be seen from its middle on; the next walk puts that right.
/// Errors:  a window server that fails, or a window that goes away meanwhile, stops no walk: levels are then
///          -1, rectangles empty and windows opaque. A walk that runs out of memory publishes that nothing is
///          shared, with a trace at ERROR.
class ShareCapturerContextMac : public ShareCapturerContext {
public:
    /// -1 when it has walked, or the last walk stands; 0 when SHARE_CONFIG_FLAG_NO_WINDOW_WALK keeps it from
    /// walking, and all stays as it was.
    int UpdateShareCapturerContext() override;
    bool DoesLastWalkStand() const override;

    /// Always 0. The scale of the last shared display becomes that of the process.
    int InitDisplays() override;

private:
    struct Walk;
    struct WalkedWindow;

    /// All that a walk goes by: who finds the same again would find the same windows and regions.
    struct WalkInputs {
        platform::CGSMoment moment;    // windows and displays, Docks included
        std::uint64_t revision = 0;    // lists, share type, shared displays and their region
        bool excludesMenuBars = false; // m_bNoWindowBaseArea and m_bExcludeMenuBar, but for the share type
        bool findsExposed = false;     // m_bFindsExposed
        AppDisplayRule appDisplayRule{};
        /// m_mapAppDisplayRects as the walk before left it: by it menu bars are told. Empty where they
        /// aren't.
        std::map<unsigned, TVLRect> menuBarDisplays;

        bool operator==(const WalkInputs&) const = default;
    };

    /// All but the moment, which comes with the list of windows.
    WalkInputs _ReadInputs() const;
    bool _LastWalkStands(const WalkInputs& inputs) const;
    /// Walks over m_vOnScreen, which took that many milliseconds to list, and publishes. True when all of it
    /// was found out, and would be again.
    bool _WalkOnScreen(const WalkInputs& inputs, int listingTime);
    Walk _BeginWalk(const WalkInputs& inputs) const;
    void _WalkWindow(Walk& walk, unsigned id);
    void _KeepWindow(Walk& walk, WalkedWindow& window);
    void _KeepOutWindow(Walk& walk, const WalkedWindow& window);
    // What is exposed: what isn't kept, less the kept windows in front of it. In a share of a desktop a
    // translucent window covers nothing; in one of windows it is part of what is shared, as it is seen.
    void _Expose(Walk& walk, const WalkedWindow& window);
    void _CoverExposed(Walk& walk, const WalkedWindow& window);
    /// Makes overlap of a part of the visible region.
    void _HideVisible(Walk& walk, const TVLRegion& hidden);
    void _HideDocks(Walk& walk);
    /// What the kept windows cover is what is seen of them and what is hidden of them. Joined once at the end
    /// and not window by window: regions are what a walk takes its time for.
    void _UniteKept(Walk& walk);
    void _ClipToDisplays(Walk& walk);
    /// For a walk that lost sight of what is hidden: its results would show what must not be seen.
    void _ShowNothing();

    void _TraceWindow(const WalkedWindow& window) const;
    void _TraceFound() const;

    // Both belong to the thread of the walk.
    std::vector<int> m_vOnScreen;
    std::optional<WalkInputs> m_lastWalk; // of the walk that stands; nothing when it has to be made again
};

/// The context for whoever has been handed none.
std::shared_ptr<ShareCapturerContext> MakeShareCapturerContext();
