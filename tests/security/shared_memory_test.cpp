// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/pixels_file.h"

#include "tests/support/no_anonymous_files.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstddef>
#include <filesystem>
#include <string>

/// The memory in which the X server writes pictures: whoever could open it would see the screen.

namespace {

using namespace platform::x11;

constexpr std::size_t SIZE = std::size_t{64} << 10U;
constexpr uid_t NOBODY = 65534;

std::string PlaceOf(int descriptor) {
    return "/proc/self/fd/" + std::to_string(descriptor);
}

/// Whether it could be opened by another user who has found a way to its descriptor. Only root can tell.
bool CanBeOpenedByNobody(int descriptor) {
    const pid_t child = fork();
    if (child == 0) {
        if (setgid(NOBODY) != 0 || setuid(NOBODY) != 0 || prctl(PR_SET_DUMPABLE, 1, 0, 0, 0) != 0)
            _exit(2);
        _exit(open(PlaceOf(descriptor).c_str(), O_RDONLY) >= 0 ? 1 : 0);
    }
    int status = 0;
    EXPECT_EQ(waitpid(child, &status, 0), child);
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) < 2);
    return WEXITSTATUS(status) == 1;
}

/// Named files would outlive us, and could be found.
void ExpectPrivateAndNameless(const OwnedDescriptor& file) {
    ASSERT_TRUE(file);
    struct stat status {};
    ASSERT_EQ(fstat(file.Get(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777U, 0600U);
    EXPECT_EQ(status.st_nlink, 0u) << std::filesystem::read_symlink(PlaceOf(file.Get()));
    EXPECT_EQ(status.st_size, static_cast<off_t>(SIZE));
    EXPECT_EQ(fcntl(file.Get(), F_GETFD), FD_CLOEXEC);
    const std::string name = "/dev/shm/screenshare-test-" + std::to_string(getpid());
    EXPECT_NE(linkat(AT_FDCWD, PlaceOf(file.Get()).c_str(), AT_FDCWD, name.c_str(), AT_SYMLINK_FOLLOW), 0);
    unlink(name.c_str());
}

} // namespace

TEST(SharedMemory, IsASealedFileOfTheUsersAlone) {
    umask(0);
    const OwnedDescriptor file = OpenPixelsFile(SIZE);
    ExpectPrivateAndNameless(file);
    EXPECT_EQ(fcntl(file.Get(), F_GET_SEALS), F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_SEAL);
    EXPECT_NE(ftruncate(file.Get(), 0), 0);
}

TEST(SharedMemory, IsTheUsersAloneWhereThereAreNoAnonymousFiles) {
    umask(0);
    ForbidAnonymousFiles();
    const OwnedDescriptor file = OpenPixelsFile(SIZE);
    if (!file)
        GTEST_SKIP() << "no folder here takes files without a name";
    ExpectPrivateAndNameless(file);
}

TEST(SharedMemory, CannotBeOpenedByAnotherUser) {
    if (geteuid() != 0)
        GTEST_SKIP() << "only root can be somebody else";
    const OwnedDescriptor file = OpenPixelsFile(SIZE);
    ASSERT_TRUE(file);
    EXPECT_FALSE(CanBeOpenedByNobody(file.Get()));
    ASSERT_EQ(fchmod(file.Get(), 0644), 0);
    EXPECT_TRUE(CanBeOpenedByNobody(file.Get())) << "nothing can be opened anyway, so the case shows nothing";
}
