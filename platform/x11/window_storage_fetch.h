// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/x11/shared_pixels.h"
#include "platform/x11/window_storage.h"
#include "platform/x11/x11_connection.h"

#include <xcb/xfixes.h>

#include <cstddef>
#include <memory>

namespace platform::x11 {

/// What a fetch needs besides the window.
struct FetchTools {
    X11Connection& connection;
    SharedPixelsPool& pool;
    xcb_xfixes_region_t parts; ///< A region of the server's for passing damage along.
};

/// Brings what is known of a storage's pixels up to date. Where the pixels are known but for some damage,
/// only the rows of that are fetched, in place unless somebody holds the picture.
///
/// Used in three steps, so that those of many windows go together: Ask, then AskForRows, then Finish. If it
/// ends before, nothing is known of the pixels any more.
/// Threads: the X thread.
/// Errors:  those of X11Connection.
class StorageFetch {
public:
    StorageFetch(const FetchTools& tools, std::shared_ptr<WindowStorage> storage, const ServerPixels& pixels);

    void Ask();
    void AskForRows();
    /// False when there are no pixels, as when the window is gone.
    bool Finish();
    std::size_t BytesAskedFor() const { return m_bytesAskedFor; }

private:
    void AskForAll();
    void AskForBand(int top, int bottom);
    bool Fail();

    FetchTools m_tools;
    std::shared_ptr<WindowStorage> m_storage;
    ServerPixels m_pixels;
    Pending<xcb_xfixes_fetch_region_reply_t> m_damage;
    bool m_awaitsDamage = false;
    RowsRead m_rows;
    bool m_awaitsRows = false;
    bool m_failed = false;
    int m_top = 0;
    int m_bottom = 0;
    StoredPixels m_before; ///< Left as they are, because somebody holds them.
    StoredPixels m_result;
    std::size_t m_bytesAskedFor = 0;
};

} // namespace platform::x11
