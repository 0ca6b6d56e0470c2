// SPDX-License-Identifier: Apache-2.0
#include "x11_shared_memory.h"

#include "x11_connection.h"

#include <fcntl.h>
#include <sys/mman.h>
#include <unistd.h>

#include <utility>

namespace {

// Sealed at its size, so that neither side can cut the memory short under the other and make it fault.
int CreateSealedMemory(std::size_t size) {
    const int fd = memfd_create("screen picture", MFD_CLOEXEC | MFD_ALLOW_SEALING);
    if (fd < 0) {
        return -1;
    }
    if (ftruncate(fd, static_cast<off_t>(size)) != 0 ||
        fcntl(fd, F_ADD_SEALS, F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_SEAL) != 0) {
        close(fd);
        return -1;
    }
    return fd;
}

// Passing memory by file descriptor came with 1.2. A request of an extension that the server doesn't have
// would break the connection, hence the question before the question.
bool TakesFileDescriptors(X11Connection& connection) {
    if (!connection.HasExtension("MIT-SHM")) {
        return false;
    }
    const auto version =
        connection.Await<xcb_shm_query_version_reply_t>(xcb_shm_query_version(connection.Get()));
    return version &&
           (version->major_version > 1 || (version->major_version == 1 && version->minor_version >= 2));
}

} // namespace

std::unique_ptr<X11SharedMemory> X11SharedMemory::Create(X11Connection& connection, std::size_t size) {
    if (!TakesFileDescriptors(connection)) {
        return nullptr;
    }
    const int fd = CreateSealedMemory(size);
    if (fd < 0) {
        return nullptr;
    }
    void* data = mmap(nullptr, size, PROT_READ, MAP_SHARED, fd, 0);
    if (data == MAP_FAILED) {
        close(fd);
        return nullptr;
    }
    std::unique_ptr<X11SharedMemory> memory(new X11SharedMemory(connection, data, size));
    return memory->Attach(fd) ? std::move(memory) : nullptr;
}

X11SharedMemory::X11SharedMemory(X11Connection& connection, void* data, std::size_t size)
    : m_connection(connection),
      m_data(data),
      m_size(size) {}

X11SharedMemory::~X11SharedMemory() {
    if (m_connection.IsAlive()) {
        xcb_shm_detach(m_connection.Get(), m_segment);
        xcb_flush(m_connection.Get());
    }
    munmap(m_data, m_size);
}

bool X11SharedMemory::Attach(int memoryFd) {
    m_segment = xcb_generate_id(m_connection.Get());
    // XCB closes the descriptor when it has been sent.
    xcb_shm_attach_fd(m_connection.Get(), m_segment, memoryFd, 0);

    // Attaching has no answer of its own; one pixel through the memory tells whether it worked.
    const auto cookie = xcb_shm_get_image(m_connection.Get(), m_connection.GetScreen()->root, 0, 0, 1, 1, ~0U,
                                          XCB_IMAGE_FORMAT_Z_PIXMAP, m_segment, 0);
    return m_connection.Await<xcb_shm_get_image_reply_t>(cookie) != nullptr;
}
