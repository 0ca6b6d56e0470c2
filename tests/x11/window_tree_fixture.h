// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/x11/window_tree_bench.h"

#include <gtest/gtest.h>

#include <optional>
#include <vector>

/// A server, a client of it, and the tree of its windows.
class WindowTreeFixture : public testing::Test {
public:
    using Ids = std::vector<platform::CGWindowID>;

protected:
    void SetUp() override {
        if (const auto missing = MissingProgram({"Xvfb"})) {
            GTEST_SKIP() << *missing;
            return;
        }
        server.emplace();
        client.emplace(*server);
        bench.emplace(server->Display());
        bench->Begin();
    }

    TreeBench& Bench() { return *bench; }
    ForeignClient& Client() { return *client; }

    /// A second reading of the same server, by somebody who has the same memory.
    Ids ReadAnew() {
        TreeBench other(server->Display(), bench->memory);
        other.Begin();
        return other.Ids();
    }

    std::optional<XServer> server;
    std::optional<ForeignClient> client;
    std::optional<TreeBench> bench;
};
