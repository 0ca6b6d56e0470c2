// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/x11/owned_descriptor.h"

#include <cstddef>

namespace platform::x11 {

/// A file of so many bytes to be mapped and handed to the X server by its descriptor. It has no name, nobody
/// but its owner may open it again through /proc, and a child that runs another program doesn't have it. An
/// anonymous file, sealed against shrinking, where the kernel has such; else one in /dev/shm or
/// XDG_RUNTIME_DIR. None when there is no memory. Threads: any.
OwnedDescriptor OpenPixelsFile(std::size_t bytes);

} // namespace platform::x11
