// SPDX-License-Identifier: Apache-2.0
#include "tests/soak/soak_plant.h"

#include <fcntl.h>
#include <unistd.h>

#include <cstddef>

SoakPlant::SoakPlant(SoakLoss loss, const std::string& display)
    : m_loss(loss),
      m_link(loss == SoakLoss::Resource ? std::make_unique<XLink>(display) : nullptr) {}

SoakPlant::~SoakPlant() {
    {
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_ends = true;
    }
    m_ending.notify_all();
    for (std::thread& thread : m_threads)
        thread.join();
    for (const int descriptor : m_descriptors)
        close(descriptor);
}

void SoakPlant::Lose() {
    switch (m_loss) {
        case SoakLoss::Nothing:
            return;
        case SoakLoss::Memory:
            return LoseMemory();
        case SoakLoss::Descriptor:
            return LoseDescriptor();
        case SoakLoss::Thread:
            return LoseThread();
        case SoakLoss::Resource:
            return LoseResource();
    }
}

void SoakPlant::LoseMemory() {
    constexpr std::size_t BLOCK = 512 * 1024;
    m_blocks.emplace_back(BLOCK, '\1'); // written to, or it would not be resident
}

void SoakPlant::LoseDescriptor() {
    m_descriptors.push_back(open("/dev/null", O_RDONLY | O_CLOEXEC));
}

void SoakPlant::LoseThread() {
    m_threads.emplace_back([this] {
        std::unique_lock<std::mutex> lock(m_mutex);
        m_ending.wait(lock, [this] { return m_ends; });
    });
}

void SoakPlant::LoseResource() {
    xcb_create_pixmap(m_link->Get(), m_link->Screen().root_depth, xcb_generate_id(m_link->Get()),
                      m_link->Root(), 1, 1);
    m_link->RoundTrip();
}
