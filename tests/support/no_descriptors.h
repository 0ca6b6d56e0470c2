// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <gtest/gtest.h>
#include <sys/resource.h>
#include <unistd.h>

#include <fcntl.h>

#include <algorithm>
#include <cstddef>
#include <filesystem>
#include <string>
#include <vector>

/// While it lives, the process can open nothing: every descriptor that its limit allows is taken.
class CNoDescriptorsScope {
public:
    CNoDescriptorsScope() {
        getrlimit(RLIMIT_NOFILE, &m_before);
        const rlimit low{HighestOpen() + ROOM, m_before.rlim_max};
        m_taken.reserve(low.rlim_cur);
        EXPECT_EQ(setrlimit(RLIMIT_NOFILE, &low), 0);
        for (int taken = Open(); taken >= 0; taken = Open())
            m_taken.push_back(taken);
        EXPECT_FALSE(m_taken.empty());
    }
    ~CNoDescriptorsScope() {
        setrlimit(RLIMIT_NOFILE, &m_before);
        for (const int taken : m_taken)
            close(taken);
    }
    CNoDescriptorsScope(const CNoDescriptorsScope&) = delete;
    CNoDescriptorsScope& operator=(const CNoDescriptorsScope&) = delete;

private:
    static constexpr rlim_t ROOM = 2;

    static int Open() { return open("/dev/null", O_RDONLY | O_CLOEXEC); }
    static rlim_t HighestOpen() {
        rlim_t highest = 0;
        for (const auto& entry : std::filesystem::directory_iterator("/proc/self/fd"))
            highest = std::max<rlim_t>(highest, std::stoul(entry.path().filename().string()));
        return highest;
    }

    rlimit m_before{};
    std::vector<int> m_taken;
};
