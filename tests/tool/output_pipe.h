// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/support/threads.h"

#include <gtest/gtest.h>
#include <poll.h>
#include <unistd.h>

#include <array>
#include <chrono>
#include <string>

/// A pipe in place of standard output for the length of a scope.
class OutputPipe {
public:
    OutputPipe() : m_former(dup(STDOUT_FILENO)) {
        EXPECT_EQ(pipe(m_ends.data()), 0);
        dup2(m_ends[1], STDOUT_FILENO);
        close(m_ends[1]);
    }
    ~OutputPipe() {
        dup2(m_former, STDOUT_FILENO);
        close(m_former);
        CloseReader();
    }
    OutputPipe(const OutputPipe&) = delete;
    OutputPipe& operator=(const OutputPipe&) = delete;

    /// A line without its end; empty when none comes.
    std::string ReadLine() {
        std::string line;
        char next = 0;
        pollfd readable{m_ends[0], POLLIN, 0};
        while (poll(&readable, 1, static_cast<int>(std::chrono::milliseconds(PATIENCE).count())) > 0 &&
               read(m_ends[0], &next, 1) == 1 && next != '\n')
            line += next;
        return line;
    }
    void CloseReader() {
        if (m_ends[0] >= 0)
            close(m_ends[0]);
        m_ends[0] = -1;
    }

private:
    std::array<int, 2> m_ends{-1, -1};
    const int m_former;
};
