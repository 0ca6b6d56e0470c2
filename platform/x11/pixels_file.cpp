// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/pixels_file.h"

#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdlib>

namespace platform::x11 {

namespace {

constexpr mode_t OWNER_ONLY = 0600;

OwnedDescriptor OpenSealed(std::size_t bytes) {
    OwnedDescriptor file(memfd_create("pixels", MFD_CLOEXEC | MFD_ALLOW_SEALING));
    // An anonymous file is made open to everybody who finds a way to its descriptor.
    if (!file || fchmod(file.Get(), OWNER_ONLY) != 0 || ftruncate(file.Get(), static_cast<off_t>(bytes)) != 0)
        return {};
    // A server that shrank the file would have us killed at the next look at it.
    if (fcntl(file.Get(), F_ADD_SEALS, F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_SEAL) != 0)
        return {};
    return file;
}

OwnedDescriptor OpenNamelessIn(const char* folder, std::size_t bytes) {
    if (folder == nullptr)
        return {};
    OwnedDescriptor file(open(folder, O_TMPFILE | O_RDWR | O_CLOEXEC | O_EXCL, OWNER_ONLY));
    // Such a file system has a limit: what isn't set aside now would kill whoever touches it later.
    if (!file || posix_fallocate(file.Get(), 0, static_cast<off_t>(bytes)) != 0)
        return {};
    return file;
}

} // namespace

OwnedDescriptor OpenPixelsFile(std::size_t bytes) {
    if (OwnedDescriptor sealed = OpenSealed(bytes))
        return sealed;
    if (OwnedDescriptor nameless = OpenNamelessIn("/dev/shm", bytes))
        return nameless;
    return OpenNamelessIn(std::getenv("XDG_RUNTIME_DIR"), bytes); // NOLINT(concurrency-mt-unsafe)
}

} // namespace platform::x11
