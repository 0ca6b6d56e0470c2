// SPDX-License-Identifier: Apache-2.0
#include "tools/capture_output.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <cstring>

namespace {

/// How long a reader may take nothing once the end is asked for, ms.
constexpr int LAST_PATIENCE_MS = 1000;

} // namespace

WriteFailure FailureFromErrno(const std::string& what, int error) {
    if (error == EPIPE)
        return {EXIT_CODE_READER_GONE, "the reader of " + what + " has closed the pipe"};
    return {EXIT_CODE_NOT_WRITTEN,
            "cannot write " + what + ": " + (error != 0 ? std::strerror(error) : "it is no plain file")};
}

CaptureOutput::~CaptureOutput() {
    if (m_isOwn)
        close(m_descriptor);
}

WriteResult CaptureOutput::Open(const std::string& file) {
    m_isOwn = file != "-";
    m_name = m_isOwn ? file : "standard output";
    if (!m_isOwn) {
        m_descriptor = STDOUT_FILENO;
    } else {
        m_descriptor = open(file.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0666);
        m_isOwn = m_descriptor >= 0;
    }
    struct stat status {};
    if (m_descriptor < 0 || fstat(m_descriptor, &status) != 0)
        return Failure(errno);
    m_isPlain = S_ISREG(status.st_mode);
    m_isPipe = S_ISFIFO(status.st_mode) || S_ISSOCK(status.st_mode);
    return std::nullopt;
}

WriteResult CaptureOutput::Write(const void* data, std::size_t size) {
    const auto* next = static_cast<const char*>(data);
    while (size > 0) {
        if (!m_isPlain && !WaitUntilWritable())
            return WriteFailure{EXIT_CODE_NOT_WRITTEN, "the reader of " + m_name + " takes nothing any more"};
        // A pipe that is writable takes so much without making the writer wait where no flag wakes it.
        const ssize_t count =
            write(m_descriptor, next, m_isPlain ? size : std::min<std::size_t>(size, PIPE_BUF));
        if (count < 0 && errno != EINTR && errno != EAGAIN)
            return Failure(errno);
        if (count <= 0)
            continue;
        next += count;
        size -= static_cast<std::size_t>(count);
        m_bytes += static_cast<std::uint64_t>(count);
    }
    return std::nullopt;
}

/// Also true when writing will fail.
bool CaptureOutput::WaitUntilWritable() const {
    while (true) {
        const bool isLast = m_stop.IsRaised();
        std::array<pollfd, 2> descriptors{
            {{m_descriptor, POLLOUT, 0}, {isLast ? -1 : m_stop.Descriptor(), POLLIN, 0}}};
        const int count = poll(descriptors.data(), descriptors.size(), isLast ? LAST_PATIENCE_MS : -1);
        if (descriptors[0].revents != 0)
            return true;
        if (count == 0)
            return false;
    }
}

WriteResult CaptureOutput::Close() {
    if (!m_isOwn)
        return std::nullopt;
    m_isOwn = false;
    if (close(m_descriptor) != 0)
        return Failure(errno);
    return std::nullopt;
}

WriteFailure CaptureOutput::Failure(int error) const {
    return FailureFromErrno(m_name, error);
}
