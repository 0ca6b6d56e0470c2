// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"
#include "platform/x11/shared_pixels.h"
#include "platform/x11/window_tree.h"
#include "platform/x11/x11_connection.h"

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>

namespace platform::x11 {

/// A picture of windows, and what is known of it.
struct TakenPicture {
    PictureOutcome outcome = PictureOutcome::Failed;
    std::shared_ptr<WindowPicture> picture; ///< Null unless Ok. Without a moment.
    /// Until then the same would be taken again, as long as no event comes; nothing when that can't be told.
    std::optional<std::chrono::nanoseconds> standsUntil;
    bool hasFetched = false; ///< Pixels have been fetched, or let go of.
};

/// The pictures of windows, from their own storage.
///
/// The server keeps the storage of each child of the root apart (Composite), so a covered window is whole.
/// What was fetched once is kept until the window changes (Damage), so a window that stands still costs
/// nothing.
///
/// A storage that is new, because the window was mapped or resized, begins as a copy of what the screen
/// showed there: other windows' pixels. See PaintProof for how long it is withheld.
///
/// Threads: the X thread.
/// Errors:  those of X11Connection.
class WindowStorages final : public TopLevelWatcher {
public:
    /// Pictures that nobody holds are kept up to so many bytes,
    static constexpr std::size_t CACHE_LIMIT = std::size_t{64} << 20U;
    /// and for so long after they were last asked for.
    static constexpr std::chrono::nanoseconds CACHE_TIME = std::chrono::seconds(5);

    /// Larger storages are not fetched.
    static constexpr std::size_t LARGEST_STORAGE = std::size_t{256} << 20U;

    explicit WindowStorages(X11Connection& connection);
    ~WindowStorages() override;
    WindowStorages(const WindowStorages&) = delete;
    WindowStorages& operator=(const WindowStorages&) = delete;

    /// Has the server keep storages. Before the windows are read, under the same grab. Of a window that is
    /// there already only what is seen is its own then, unless `composited`: a compositor has had the
    /// storages kept all along.
    void Redirect(bool composited);
    /// Without a compositor nothing is translucent, whatever a window's pixels say.
    void SetComposited(bool composited);

    void OnAdded(const TopLevel& window) override;
    void OnStorageRenewed(const TopLevel& window, unsigned sequence) override;
    void OnUnmapped(const TopLevel& window) override;
    void OnGone(const TopLevel& window) override;

    /// Takes in damage, and looks at rearrangements, so it is to be given every event, whatever the tree says
    /// of it, and after the tree.
    /// False for one that may concern others.
    bool OnEvent(const xcb_generic_event_t& event);
    /// When a window is to be asked to paint, or the cache to be looked through.
    std::optional<std::chrono::nanoseconds> NextDue() const;
    /// True when something was due.
    bool DoDue();

    /// Asks for the damage of windows that are known to have changed, so that the next answer of the server
    /// brings it along and a picture needn't wait for it once more. Tells how many bytes of pixels come with
    /// it, none mostly; nothing when there was nothing to ask for.
    std::optional<std::size_t> AskAhead();

    /// One picture of the listed windows, in the order of the tree, all of one moment: when the stack changes
    /// meanwhile it is made again, at last with the server held. A window that is beyond LARGEST_STORAGE, or
    /// whose pixels nobody here can read, has no layer; one trace tells so.
    /// `pointer` is where the pointer is, in points, if that is known.
    /// `catchUp` has the session take in every event that is here.
    TakenPicture Take(const WindowPictureRequest& request, WindowTree& tree,
                      const std::optional<CGPoint>& pointer, const std::function<void()>& catchUp);

    /// Whether windows show nothing but their own pixels in `place`, a part of the root. A new window, or one
    /// that has grown, shows on the screen as well what lay behind it, until it has painted. Windows that are
    /// found not to have are asked to. `catchUp` as above.
    bool ArePainted(const PixelRect& place, const WindowTree& tree, const std::function<void()>& catchUp);
    /// When something last turned out to be a window's own.
    std::chrono::nanoseconds LastPainted() const;

    /// How many fetches from the server there were, and of how many bytes: for tests and benchmarks.
    struct Traffic {
        std::uint64_t fetches = 0;
        std::uint64_t bytes = 0;
    };
    Traffic TrafficSoFar() const;

private:
    struct State;
    class Taking;
    const std::unique_ptr<State> m_state;
};

} // namespace platform::x11
