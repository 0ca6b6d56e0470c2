// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/soak/soak_options.h"
#include "tests/x11/x11_rig.h"

#include <condition_variable>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

/// Holds on to more and more of something, until it is destroyed: what a leak looks like from outside.
/// Threads: one at a time.
class SoakPlant {
public:
    SoakPlant(SoakLoss loss, const std::string& display);
    ~SoakPlant();
    SoakPlant(const SoakPlant&) = delete;
    SoakPlant& operator=(const SoakPlant&) = delete;

    /// Some more of it.
    void Lose();

private:
    void LoseMemory();
    void LoseDescriptor();
    void LoseThread();
    void LoseResource();

    const SoakLoss m_loss;
    std::unique_ptr<XLink> m_link; // only for resources of the server, which end with it
    std::vector<std::vector<char>> m_blocks;
    std::vector<int> m_descriptors;
    std::vector<std::thread> m_threads;
    std::mutex m_mutex;
    std::condition_variable m_ending;
    bool m_ends = false; // guarded by m_mutex
};
