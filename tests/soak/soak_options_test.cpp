// SPDX-License-Identifier: Apache-2.0
#include "tests/soak/soak_options.h"

#include <gtest/gtest.h>

#include <chrono>
#include <initializer_list>
#include <stdexcept>
#include <vector>

namespace {

SoakOptions Read(std::initializer_list<const char*> arguments) {
    std::vector<const char*> all{"soak"};
    all.insert(all.end(), arguments);
    return ReadSoakOptions(static_cast<int>(all.size()), all.data());
}

} // namespace

TEST(SoakOptions, AreReadWhole) {
    const SoakOptions options = Read({"--seconds=1800", "--interval=500", "--warm-up=250", "--size=200x120",
                                      "--fps=15", "--seed=7", "--json=a=b", "--lose=thread"});
    EXPECT_EQ(options.duration, std::chrono::minutes(30));
    EXPECT_EQ(options.Samples(), 3600U);
    EXPECT_EQ(options.warmUp, std::chrono::milliseconds(250));
    EXPECT_EQ(options.width, 200);
    EXPECT_EQ(options.height, 120);
    EXPECT_EQ(options.framesPerSecond, 15U);
    EXPECT_EQ(options.seed, 7U);
    EXPECT_EQ(options.json, "a=b");
    EXPECT_EQ(options.loss, SoakLoss::Thread);
}

TEST(SoakOptions, RefuseWhatCannotBeRunOrJudged) {
    for (const char* const argument :
         {"--seconds=39", "--seconds=", "--seconds=-60", "--seconds=60s", "--seconds=99999999999",
          "--interval=0", "--interval=100000", "--size=200", "--size=0x120", "--size=99x120",
          "--size=200x5000", "--fps=0", "--lose=nothing", "--sed=1", "seconds", "--seed"})
        EXPECT_THROW(Read({argument}), std::invalid_argument) << argument;
    EXPECT_NO_THROW(Read({"--seconds=40"}));
    EXPECT_NO_THROW(Read({}));
}
