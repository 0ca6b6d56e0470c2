// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/window_storages_state.h"
#include "util/cm_clock.h"
#include "util/cm_trace.h"

#include <algorithm>
#include <cstddef>
#include <utility>
#include <vector>

/// Taking a picture of chosen windows.
namespace platform::x11 {

namespace {

/// How often it is tried without holding the server.
constexpr int FREE_TRIES = 3;

bool Touch(const CGRect& one, const CGRect& other) {
    return one.origin.x < other.origin.x + other.size.width &&
           other.origin.x < one.origin.x + one.size.width &&
           one.origin.y < other.origin.y + other.size.height &&
           other.origin.y < one.origin.y + one.size.height;
}

PixelRect StorageOf(const TopLevel& window) {
    return {0, 0, window.StorageWidth(), window.StorageHeight()};
}

/// What of a storage can be seen; nothing for all of it.
std::optional<PixelRegion> ShapeOf(const TopLevel& window) {
    if (!window.shaped)
        return std::nullopt;
    PixelRegion shape;
    for (const PixelRect& rect : window.shape)
        shape.Add(rect);
    shape.Intersect(StorageOf(window));
    return shape;
}

} // namespace

/// One try at one picture.
class WindowStorages::Taking {
public:
    Taking(State& state, const WindowPictureRequest& request, WindowTree& tree,
           const std::optional<CGPoint>& pointer)
        : m_state(state),
          m_rect(request.rect),
          m_asked(request.windows),
          m_tree(tree),
          m_pointer(pointer) {
        std::sort(m_asked.begin(), m_asked.end());
    }

    /// Nothing when the stack has changed meanwhile.
    std::optional<TakenPicture> Try(const std::function<void()>& catchUp);

private:
    /// A layer in the making.
    struct Part {
        PictureLayer layer;
        std::shared_ptr<WindowStorage> storage; // none for what has its picture already
        ServerPixels pixels;
        PixelRect visible;
        std::optional<PixelRegion> shape;
        unsigned renewals = 0;
    };

    bool SettleTree(const std::function<void()>& catchUp);
    void Choose(const WindowSnapshot& snapshot);
    const WindowInfo* Chosen(const WindowSnapshot& snapshot, CGWindowID id);
    void AddWallpaper(const WindowInfo& info);
    void AddWindow(const WindowInfo& info, const TopLevel& window);
    bool IsTooLarge(const TopLevel& window);
    void Fetch();
    bool IsStillTrue(const std::function<void()>& catchUp);
    TakenPicture Result();
    static bool Stands(const Part& part);

    State& m_state;
    const CGRect m_rect;
    std::vector<CGWindowID> m_asked; // sorted
    WindowTree& m_tree;
    const std::optional<CGPoint> m_pointer;
    std::uint64_t m_generation = 0;
    bool m_anyExists = false;
    std::chrono::nanoseconds m_standsUntil = std::chrono::nanoseconds::max();
    std::vector<Part> m_parts; // back to front
    std::vector<StorageFetch> m_fetches;
};

std::optional<TakenPicture> WindowStorages::Taking::Try(const std::function<void()>& catchUp) {
    if (!SettleTree(catchUp))
        return std::nullopt;
    const std::shared_ptr<const WindowSnapshot> snapshot = m_tree.Snapshot();
    m_generation = snapshot->Generation();
    Choose(*snapshot);
    Fetch();
    if (!IsStillTrue(catchUp))
        return std::nullopt;
    return Result();
}

/// True when a snapshot can be made of all that was told so far.
bool WindowStorages::Taking::SettleTree(const std::function<void()>& catchUp) {
    catchUp();
    m_state.ConfirmPaintings(catchUp);
    if (!m_tree.IsSettled())
        m_tree.Settle();
    return m_tree.IsSettled() && m_tree.Snapshot()->Generation() == m_tree.Generation();
}

void WindowStorages::Taking::Choose(const WindowSnapshot& snapshot) {
    if (m_tree.Wallpaper() != 0) {
        if (const WindowInfo* const info = Chosen(snapshot, m_state.connection.Root()))
            AddWallpaper(*info);
    }
    const std::vector<const TopLevel*> frontFirst = m_tree.FrontFirst();
    for (auto window = frontFirst.rbegin(); window != frontFirst.rend(); ++window) {
        if (const WindowInfo* const info = Chosen(snapshot, (*window)->id))
            AddWindow(*info, **window);
    }
}

/// Null unless it is asked for and may be shown.
const WindowInfo* WindowStorages::Taking::Chosen(const WindowSnapshot& snapshot, CGWindowID id) {
    if (id == 0 || !std::binary_search(m_asked.begin(), m_asked.end(), id))
        return nullptr;
    const WindowInfo* const info = snapshot.Find(id);
    if (info == nullptr)
        return nullptr;
    m_anyExists = true;
    return info->sharing != SharingState::None && Touch(info->frame, m_rect) ? info : nullptr;
}

void WindowStorages::Taking::AddWallpaper(const WindowInfo& info) {
    const xcb_screen_t& screen = m_state.connection.Screen();
    const std::optional<ServerPixels> pixels = m_state.PixelsOf(screen.root_depth, screen.root_visual);
    if (!pixels)
        return;
    std::size_t fetched = 0;
    Part part;
    part.layer.window = info.id;
    part.layer.alpha = info.alpha;
    part.layer.picture =
        m_state.wallpaper.Take(m_state.Tools(), *pixels, m_tree.Wallpaper(), info.frame, fetched);
    m_state.CountTraffic(fetched);
    m_state.isDueKnown = m_state.isDueKnown && fetched == 0;
    m_standsUntil = m_state.wallpaper.FreshUntil();
    if (part.layer.picture == nullptr)
        return;
    part.layer.frame = {info.frame.origin, part.layer.picture->rect.size};
    m_parts.push_back(std::move(part));
}

void WindowStorages::Taking::AddWindow(const WindowInfo& info, const TopLevel& window) {
    const auto found = m_state.storages.find(window.window);
    if (found == m_state.storages.end())
        return;
    Part part;
    part.layer.window = info.id;
    part.layer.frame = info.frame;
    part.layer.alpha = info.alpha;
    WindowStorage& storage = *found->second;
    if (!info.onScreen) {
        part.layer.picture = storage.LastShown();
        part.layer.stale = true;
        storage.AskForLast(CmSteadyNow());
        if (part.layer.picture != nullptr)
            m_parts.push_back(std::move(part));
        return;
    }
    const std::optional<ServerPixels> pixels = m_state.PixelsOf(window.depth, window.visual);
    part.visible = window.VisiblePart();
    const bool isEmpty = part.visible.left >= part.visible.right || part.visible.top >= part.visible.bottom;
    if (!pixels || isEmpty || IsTooLarge(window))
        return;
    part.pixels = *pixels;
    part.shape = ShapeOf(window);
    part.storage = found->second;
    part.renewals = storage.Renewals();
    if (storage.Ask(part.shape, CmSteadyNow()))
        m_state.isDueKnown = false;
    m_parts.push_back(std::move(part));
}

bool WindowStorages::Taking::IsTooLarge(const TopLevel& window) {
    const auto width = static_cast<std::size_t>(window.StorageWidth());
    const auto height = static_cast<std::size_t>(window.StorageHeight());
    if (width * height * 4 <= LARGEST_STORAGE)
        return false;
    if (!std::exchange(m_state.hasTracedSize, true))
        CmTraceWarning("[WindowStorages]>>window is too large for a picture, ", width, "x", height);
    return true;
}

void WindowStorages::Taking::Fetch() {
    for (const Part& part : m_parts) {
        if (part.storage != nullptr && !part.storage->IsCurrent(part.pixels))
            m_fetches.emplace_back(m_state.Tools(), part.storage, part.pixels);
    }
    if (m_fetches.empty())
        return;
    m_state.isDueKnown = false;
    for (StorageFetch& fetch : m_fetches)
        fetch.Ask();
    for (StorageFetch& fetch : m_fetches)
        fetch.AskForPixels();
    for (StorageFetch& fetch : m_fetches) {
        fetch.Finish();
        m_state.CountTraffic(fetch.BytesAskedFor());
    }
}

/// Every event that was sent before the last answer is here by now.
bool WindowStorages::Taking::IsStillTrue(const std::function<void()>& catchUp) {
    catchUp();
    for (StorageFetch& fetch : m_fetches)
        fetch.Give();
    if (!m_tree.IsSettled())
        return false;
    const bool isRenewed = std::any_of(m_parts.begin(), m_parts.end(), [](const Part& part) {
        return part.storage != nullptr && part.storage->Renewals() != part.renewals;
    });
    return !isRenewed && m_tree.Generation() == m_generation;
}

/// Time alone doesn't change what a picture of it shows.
bool WindowStorages::Taking::Stands(const Part& part) {
    if (part.storage == nullptr)
        return !part.layer.stale && part.layer.picture->serial != 0;
    if (part.layer.picture == nullptr || part.layer.picture->serial == 0 ||
        !part.storage->IsCurrent(part.pixels))
        return false;
    if (part.storage->Proof().IsProven())
        return true;
    PixelRegion missing = part.storage->Proof().Unproven();
    missing.Intersect(part.visible);
    if (part.shape)
        missing.Intersect(*part.shape);
    return missing.IsEmpty();
}

TakenPicture WindowStorages::Taking::Result() {
    TakenPicture taken;
    taken.outcome = PictureOutcome::Gone;
    if (!m_anyExists)
        return taken;
    auto picture = std::make_shared<WindowPicture>();
    bool stands = true;
    for (Part& part : m_parts) {
        if (part.storage != nullptr)
            part.layer.picture = part.storage->Show(part.visible, part.shape, part.layer.frame);
        stands = stands && Stands(part);
        if (part.layer.picture != nullptr)
            picture->layers.push_back(std::move(part.layer));
    }
    picture->time = CmSteadyNow();
    picture->generation = m_generation;
    picture->pointer = m_pointer;
    taken.outcome = PictureOutcome::Ok;
    taken.picture = std::move(picture);
    if (stands)
        taken.standsUntil = m_standsUntil;
    taken.hasFetched = m_state.hasFetched;
    return taken;
}

std::optional<std::size_t> WindowStorages::AskAhead() {
    std::optional<std::size_t> bytes;
    for (const auto& [window, storage] : m_state->storages) {
        if (!storage->IsDamageWorthAsking())
            continue;
        storage->AskForDamage(m_state->Tools().parts);
        bytes = bytes.value_or(0) + storage->AskAheadForPixels(m_state->pool);
    }
    return bytes;
}

TakenPicture WindowStorages::Take(const WindowPictureRequest& request, WindowTree& tree,
                                  const std::optional<CGPoint>& pointer,
                                  const std::function<void()>& catchUp) {
    const Extensions& has = m_state->connection.Has();
    TakenPicture none;
    none.outcome = PictureOutcome::Unsupported;
    if (!has.composite || !has.damage || !has.xfixes)
        return none;
    m_state->hasFetched = false;
    m_state->Trim();
    for (int i = 0; i < FREE_TRIES; ++i) {
        if (auto result = Taking(*m_state, request, tree, pointer).Try(catchUp))
            return *std::move(result);
    }
    const ServerGrab grab(m_state->connection);
    // What was sent before the server was held has to be here first.
    m_state->connection.RoundTrip();
    if (auto result = Taking(*m_state, request, tree, pointer).Try(catchUp))
        return *std::move(result);
    none.outcome = PictureOutcome::Stale;
    none.hasFetched = true;
    return none;
}

// ---- The screen

bool WindowStorages::State::AreAllProven() const {
    return std::all_of(storages.begin(), storages.end(), [](const auto& each) {
        return !each.second->IsMapped() || each.second->Proof().IsProven();
    });
}

bool WindowStorages::ArePainted(const PixelRect& place, const WindowTree& tree,
                                const std::function<void()>& catchUp) {
    State& state = *m_state;
    state.ConfirmPaintings(catchUp);
    if (state.AreAllProven())
        return true;
    state.isDueKnown = false;
    bool arePainted = true;
    PixelRegion uncovered(place);
    for (const TopLevel* const window : tree.FrontFirst()) {
        WindowStorage* const storage = state.Find(window->window);
        if (storage == nullptr || !window->mapped || window->inputOnly)
            continue;
        const std::optional<PixelRegion> bounding = ShapeOf(*window);
        PixelRegion shape = bounding ? *bounding : PixelRegion(StorageOf(*window));
        PixelRegion foreign = storage->Proof().Unproven();
        foreign.Intersect(shape);
        foreign.Translate(window->x, window->y);
        foreign.Intersect(uncovered);
        if (!foreign.IsEmpty()) {
            storage->Ask(bounding, CmSteadyNow());
            arePainted = false;
        }
        // Under a compositor nobody knows what shines through.
        shape.Translate(window->x, window->y);
        if (!state.composited)
            uncovered.Subtract(shape);
    }
    return arePainted;
}

std::chrono::nanoseconds WindowStorages::LastPainted() const {
    return m_state->lastPainted;
}

} // namespace platform::x11
