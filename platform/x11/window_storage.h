// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/pixel_region.h"
#include "platform/window_server.h"
#include "platform/x11/paint_proof.h"
#include "platform/x11/pixel_formats.h"
#include "platform/x11/shared_pixels.h"
#include "platform/x11/window_tree.h"
#include "platform/x11/x11_connection.h"

#include <xcb/damage.h>
#include <xcb/xcb.h>
#include <xcb/xfixes.h>

#include <chrono>
#include <cstddef>
#include <memory>
#include <optional>
#include <vector>

namespace platform::x11 {

/// What was fetched of a storage, as the server sends it.
struct StoredPixels {
    std::shared_ptr<SharedPixels> block; ///< Null for nothing.
    int width = 0;
    int height = 0;
    ServerPixels pixels;
    PixelRegion unproven; ///< What wasn't the window's own when it was fetched.

    std::size_t Stride() const { return pixels.BytesPerRow(width); }
    bool IsOf(int otherWidth, int otherHeight, const ServerPixels& otherPixels) const {
        return block != nullptr && width == otherWidth && height == otherHeight && pixels == otherPixels;
    }
};

/// A picture of `visible`, an area of pixels that the server sent; what of it is not `shown` is transparent.
/// It shares the memory when it can.
std::shared_ptr<Picture> PictureOf(const ServerPixels& pixels, const std::shared_ptr<SharedPixels>& block,
                                   int width, const PixelRect& visible, const PixelRegion& shown,
                                   const CGRect& rect);

/// Pixels that are asked for before it is known where a storage was damaged.
struct PixelsAhead {
    PixelRect rect;
    /// Whole rows, which go to where they belong in the storage's own pixels.
    bool isOfRows;
    /// Else it takes them from its beginning, without gaps. It is there until the read has ended or nobody
    /// waits for it any more.
    std::shared_ptr<SharedPixels> block;
    RowsRead read;
    unsigned renewals; ///< When they were asked for.
};

/// A watch for changes or paintings of a window: a Damage object in the server.
/// Threads: the X thread.
class DamageWatch {
public:
    DamageWatch() = default;
    ~DamageWatch() { End(); }
    DamageWatch(const DamageWatch&) = delete;
    DamageWatch& operator=(const DamageWatch&) = delete;

    void Begin(X11Connection& connection, xcb_window_t window, std::uint8_t level);
    void End();
    bool IsOn() const { return m_damage != 0; }
    xcb_damage_damage_t Get() const { return m_damage; }

    /// What the server told of before it had done the request of that number counts for nothing.
    void CountFrom(unsigned sequence) { m_sequence = sequence; }
    bool Counts(unsigned sequence) const { return !IsEarlier(sequence, m_sequence); }
    unsigned CountsFrom() const { return m_sequence; }

private:
    X11Connection* m_connection = nullptr;
    xcb_damage_damage_t m_damage = 0;
    unsigned m_sequence = 0;
};

/// One child of the root: what is watched of its storage, and what of its pixels has been fetched.
/// Threads: the X thread.
/// Errors:  those of X11Connection.
class WindowStorage {
public:
    using Nanoseconds = std::chrono::nanoseconds;

    /// How long after somebody has asked for it the window counts as wanted.
    static constexpr Nanoseconds WANTED_TIME = std::chrono::seconds(5);
    /// How long the last picture of an unmapped window is kept after it was asked for.
    static constexpr Nanoseconds LAST_PICTURE_TIME = std::chrono::seconds(60);

    WindowStorage(X11Connection& connection, xcb_window_t window);
    ~WindowStorage();
    WindowStorage(const WindowStorage&) = delete;
    WindowStorage& operator=(const WindowStorage&) = delete;

    // What is told of it.
    void OnAdded(const TopLevel& told, Nanoseconds now);
    void OnRenewed(const TopLevel& told, unsigned sequence, Nanoseconds now);
    void OnUnmapped();
    void OnGone();
    /// Windows were rearranged beside it or inside it. True when that number is to end soon, since what is
    /// painted under it doesn't count.
    bool OnRearranged(unsigned sequence);
    bool OnRearrangedInside(unsigned sequence);
    /// Every event with a number below this one is here.
    void Confirm(unsigned sequence);
    /// False for what is of no watch of its.
    bool OnDamage(const xcb_damage_notify_event_t& event, unsigned sequence);
    /// It was mapped before anybody watched: all that isn't `covered` is its own. The size is with the
    /// border.
    void TrustMapped(int width, int height, int border, const PixelRegion& covered, Nanoseconds now);

    // Watching it.
    void WatchPaintings(Nanoseconds now);
    const PaintProof& Proof() const { return m_proof; }
    /// Somebody asks for it; `shape` is what of it can be seen, nothing for all of it. True when something
    /// may be due earlier than before.
    bool Ask(const std::optional<PixelRegion>& shape, Nanoseconds now);
    /// Somebody asks for its last picture, since it isn't on the screen.
    void AskForLast(Nanoseconds now) { m_asked = now; }
    std::optional<Nanoseconds> Asked() const { return m_asked; }
    std::optional<Nanoseconds> NextDue() const;
    /// Lets go of what has been kept too long, and asks the window to paint when it is time to.
    void DoDue(Nanoseconds now);

    // Fetching it.
    /// All of its pixels are here, perhaps but for some damage.
    bool HasPixels(const ServerPixels& pixels) const;
    /// Something has been painted since the damage was asked for last.
    bool HasChanged() const { return m_changed; }
    /// Nothing is to be fetched.
    bool IsCurrent(const ServerPixels& pixels) const;
    /// Named anew for each storage.
    xcb_pixmap_t Pixmap();
    void ForgetPixmap();
    /// From here on changes count.
    void CountChanges();
    /// The same, and asks by way of `parts` for what was damaged so far.
    void AskForDamage(xcb_xfixes_region_t parts);
    /// Right behind that, asks as well for the pixels of where it is likely to be. Near what was damaged
    /// last, as who types goes on there; or in the same rows, if they were damaged time and again, as by a
    /// film. If it is, the answer needs no second question. Tells how many bytes come.
    std::size_t AskAheadForPixels(SharedPixelsPool& pool);
    /// Those that were asked for behind the last question for damage, if there is some and only there; that
    /// has to be answered. They are as true as if they had been asked for now: what was painted after the
    /// question will be told later in both cases.
    std::optional<PixelsAhead> TakeAhead();
    /// Nobody wants them any more. Rows that have been read to where they belong count as damaged then.
    void DropAhead();
    /// It has changed, and what of it would be all that is to be fetched; nobody has asked yet.
    bool IsDamageWorthAsking() const { return m_changed && m_pixels.block != nullptr && m_questions.empty(); }
    /// False when it can't be had.
    bool AwaitDamage();
    /// Where pixels may be others than those that were fetched, as far as that was asked for and answered.
    const PixelRegion& Damage() const { return m_damage; }
    StoredPixels TakePixels();
    /// `changed` is where they may be others than those that were taken.
    void GivePixels(StoredPixels pixels, const PixelRegion& changed);

    int Width() const { return m_width; }
    int Height() const { return m_height; }
    int Border() const { return m_border; }
    bool IsMapped() const { return m_mapped; }
    /// Grows when what has been fetched before is void.
    unsigned Renewals() const { return m_renewals; }

    // Showing it.
    /// Of `visible`, the part of it that is `shape`, if there is one, and proven. Null when nothing is. The
    /// same object as long as it looks the same; another one tells how it came out of those of the same look.
    PicturePtr Show(const PixelRect& visible, const std::optional<PixelRegion>& shape, const CGRect& rect);
    /// The last one that was shown, perhaps null.
    PicturePtr LastShown() const { return m_picture; }

    // Keeping it.
    std::size_t KeptBytes() const;
    bool IsHeldByOthers() const;
    void Drop();

private:
    struct Look {
        PixelRect visible;
        std::optional<PixelRegion> shown; ///< Nothing for all of it.
        bool operator==(const Look&) const = default;
    };

    void SetSize(int width, int height, int border);
    void Void();
    void ForgetPixels();
    Look LookOf(const PixelRect& visible, const std::optional<PixelRegion>& shape) const;
    void LetGoOfPicture();
    void LetGoOfPictureIfAlone();
    std::size_t AskAheadForPart(SharedPixelsPool& pool);
    std::size_t AskAheadForRows();
    void NoteDamageIn(const PixelRect& around);
    void AddDamage(const xcb_xfixes_fetch_region_reply_t& answer);
    void TellSteps(Picture& picture);
    PixelRegion UnshownIn(const PixelRect& visible) const;
    std::optional<Nanoseconds> WatchEnds() const;
    std::optional<Nanoseconds> KeepingEnds() const;
    std::optional<Nanoseconds> NudgeTime() const;

    X11Connection& m_connection;
    const xcb_window_t m_window;
    int m_width = 0;
    int m_height = 0;
    int m_border = 0;
    bool m_mapped = false;
    xcb_pixmap_t m_pixmap = 0;
    unsigned m_renewals = 0;

    DamageWatch m_changes; // since the damage was asked for last
    bool m_changed = true;
    std::vector<Pending<xcb_xfixes_fetch_region_reply_t>> m_questions; // in their order
    PixelRegion m_damage;
    PixelRect m_damagedLast; // what lies around it; empty for nothing
    unsigned m_repeats = 0;  // how often just that has been damaged in a row, after the first time
    std::optional<PixelsAhead> m_ahead;
    DamageWatch m_paintings; // while not all is proven
    unsigned m_reports = 0;
    Nanoseconds m_watchedSince{0};
    PaintProof m_proof;
    std::optional<Nanoseconds> m_asked;

    StoredPixels m_pixels;
    PixelRegion m_unshown; // where they may be others than those that were shown last
    std::shared_ptr<Picture> m_picture;
    Picture m_former;               // number, steps and format of the last one, when it was let go of
    Look m_look;                    // of the last one
    bool m_isPictureCopied = false; // it has memory of its own
};

} // namespace platform::x11
