// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/pixel_region.h"
#include "platform/x11/paint_proof.h"
#include "platform/x11/x11_connection.h"

namespace platform::x11 {

/// Asks a child of the root and all windows inside it to paint `region`, which is of its storage.
/// Threads: the X thread.
/// Errors:  those of X11Connection.
void NudgeToPaint(X11Connection& connection, xcb_window_t topLevel, int border, const PixelRegion& region,
                  PaintProof::Nudge nudge);

} // namespace platform::x11
