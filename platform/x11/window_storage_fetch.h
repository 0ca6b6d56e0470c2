// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/pixel_region.h"
#include "platform/x11/shared_pixels.h"
#include "platform/x11/window_storage.h"
#include "platform/x11/x11_connection.h"

#include <xcb/xfixes.h>

#include <cstddef>
#include <memory>
#include <vector>

namespace platform::x11 {

/// What a fetch needs besides the window.
struct FetchTools {
    X11Connection& connection;
    SharedPixelsPool& pool;
    xcb_xfixes_region_t parts; ///< A region of the server's for passing damage along.
};

/// Brings what is known of a storage's pixels up to date. Where the pixels are known but for some damage,
/// only that is fetched, in place unless somebody holds the picture: rows that are damaged for the most part
/// straight into the pixels, what is narrower by way of other memory.
///
/// Used in four steps, so that those of many windows go together: Ask, AskForPixels, Finish, and Give when
/// every event is here that was sent before the last answer. If it ends before, nothing is known of the
/// pixels any more, unless nothing had changed.
/// Threads: the X thread.
/// Errors:  those of X11Connection.
class StorageFetch {
public:
    StorageFetch(const FetchTools& tools, std::shared_ptr<WindowStorage> storage, const ServerPixels& pixels);

    void Ask();
    void AskForPixels();
    void Finish();
    /// Without pixels, as when the window is gone, it gives none.
    void Give();
    std::size_t BytesAskedFor() const { return m_bytesAskedFor; }

private:
    struct Piece {
        PixelRect rect;
        bool isOfRows = false; ///< Whole rows, which the server writes straight into the pixels.
        std::size_t offset = 0;
        RowsRead read{};
    };

    void AskForAll();
    void TakeAhead(PixelsAhead ahead);
    /// Pieces that cover the damage, from top to bottom.
    void Plan(const PixelRegion& damage);
    bool TakeMemory();
    void AskFor(Piece& piece);
    void CopyOthersRows();
    void TakeInRows(const Piece& piece);
    void TakeInCopied(const Piece& piece);
    void Fail();

    FetchTools m_tools;
    std::shared_ptr<WindowStorage> m_storage;
    ServerPixels m_pixels;
    unsigned m_renewals;
    PixelRegion m_damage;
    std::vector<Piece> m_pieces; ///< Empty when nothing had changed.
    bool m_failed = false;
    std::shared_ptr<SharedPixels> m_narrow; ///< What isn't of whole rows.
    StoredPixels m_before;                  ///< Left as they are, because somebody holds them.
    StoredPixels m_result;
    PixelRegion m_written; ///< Where the result is another one than before.
    std::size_t m_bytesAskedFor = 0;
};

} // namespace platform::x11
