// SPDX-License-Identifier: Apache-2.0
#include "util/cm_trusted_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstddef>

namespace {

constexpr off_t LARGEST_FILE = 1 << 20;

class Descriptor {
public:
    explicit Descriptor(int fd) : m_fd(fd) {}
    ~Descriptor() {
        if (m_fd >= 0)
            close(m_fd);
    }
    Descriptor(const Descriptor&) = delete;
    Descriptor& operator=(const Descriptor&) = delete;

    bool IsOpen() const { return m_fd >= 0; }
    int Get() const { return m_fd; }

private:
    int m_fd;
};

/// With a slash behind it a link would be followed, whatever is asked for.
std::string WithoutSlashAtEnd(std::string folder) {
    while (folder.size() > 1 && folder.back() == '/')
        folder.pop_back();
    return folder;
}

/// Whether only this user and root can have written it.
bool IsTrusted(const struct stat& status) {
    const bool isOurs = status.st_uid == geteuid() || status.st_uid == 0;
    return isOurs && (status.st_mode & (S_IWGRP | S_IWOTH)) == 0;
}

bool IsSameState(const struct stat& a, const struct stat& b) {
    return a.st_size == b.st_size && a.st_mtim.tv_sec == b.st_mtim.tv_sec &&
           a.st_mtim.tv_nsec == b.st_mtim.tv_nsec && a.st_ctim.tv_sec == b.st_ctim.tv_sec &&
           a.st_ctim.tv_nsec == b.st_ctim.tv_nsec;
}

bool ReadFully(int fd, std::string& text) {
    std::size_t done = 0;
    while (done < text.size()) {
        const ssize_t got = read(fd, text.data() + done, text.size() - done);
        if (got < 0 && errno == EINTR)
            continue;
        if (got <= 0)
            return false;
        done += static_cast<std::size_t>(got);
    }
    return true;
}

} // namespace

std::optional<std::string> CmReadTrustedFile(const std::string& folder, const char* name) {
    const Descriptor dir(
        open(WithoutSlashAtEnd(folder).c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    struct stat dirStatus {};
    if (!dir.IsOpen() || fstat(dir.Get(), &dirStatus) != 0 || !IsTrusted(dirStatus))
        return std::nullopt;

    const Descriptor file(openat(dir.Get(), name, O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
    struct stat before {};
    if (!file.IsOpen() || fstat(file.Get(), &before) != 0 || !IsTrusted(before))
        return std::nullopt;
    if (!S_ISREG(before.st_mode) || before.st_size < 1 || before.st_size > LARGEST_FILE)
        return std::nullopt;

    std::string text(static_cast<std::size_t>(before.st_size), '\0');
    struct stat after {};
    if (!ReadFully(file.Get(), text) || fstat(file.Get(), &after) != 0 || !IsSameState(before, after))
        return std::nullopt;
    return text;
}

bool CmIsTrustedFolder(const std::string& folder) {
    struct stat status {};
    return lstat(WithoutSlashAtEnd(folder).c_str(), &status) == 0 && S_ISDIR(status.st_mode) &&
           IsTrusted(status);
}
