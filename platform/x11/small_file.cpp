// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/small_file.h"

#include "platform/x11/owned_descriptor.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>

namespace platform::x11 {

std::optional<std::string> ReadSmallFile(const std::string& path, std::size_t limit) {
    const OwnedDescriptor file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY));
    struct stat status {};
    if (!file || fstat(file.Get(), &status) != 0 || !S_ISREG(status.st_mode))
        return std::nullopt;
    std::string text;
    std::array<char, 4096> piece{};
    for (;;) {
        const ssize_t size = read(file.Get(), piece.data(), piece.size());
        if (size < 0 && errno == EINTR)
            continue;
        if (size < 0 || text.size() + static_cast<std::size_t>(size) > limit)
            return std::nullopt;
        if (size == 0)
            return text;
        text.append(piece.data(), static_cast<std::size_t>(size));
    }
}

} // namespace platform::x11
