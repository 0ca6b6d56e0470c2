// SPDX-License-Identifier: Apache-2.0
#include "src/share_graphic_util.h"

// The library has no raster code yet, so a pointer image is not drawn.
bool TvlGraphicUtil::TvlAlphaBlend(IShareFrame*, int, int, IShareFrame*) {
    return false;
}
