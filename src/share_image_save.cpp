// SPDX-License-Identifier: Apache-2.0
#include "src/share_image_save.h"

// The library has no image codec yet, so a dump writes nothing.
bool SaveFrameToPNG(IShareFrame*, const char*) {
    return false;
}
