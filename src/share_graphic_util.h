// SPDX-License-Identifier: Apache-2.0
#pragma once

class IShareFrame;

class TvlGraphicUtil {
public:
    /// Blends `source` over `target` with its top left at (x, y). False when nothing was blended.
    static bool TvlAlphaBlend(IShareFrame* target, int x, int y, IShareFrame* source);
};
