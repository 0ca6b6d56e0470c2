// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <xcb/shm.h>

#include <cstddef>
#include <cstdint>
#include <memory>

class X11Connection;

/// Memory that an X server writes pictures into and that this process reads.
class X11SharedMemory {
public:
    /// Null when the server doesn't share memory with this client, as over a network.
    static std::unique_ptr<X11SharedMemory> Create(X11Connection& connection, std::size_t size);
    ~X11SharedMemory();
    X11SharedMemory(const X11SharedMemory&) = delete;
    X11SharedMemory& operator=(const X11SharedMemory&) = delete;

    xcb_shm_seg_t GetSegment() const { return m_segment; }
    const std::uint8_t* GetData() const { return static_cast<const std::uint8_t*>(m_data); }
    std::size_t GetSize() const { return m_size; }

private:
    X11SharedMemory(X11Connection& connection, void* data, std::size_t size);
    bool Attach(int memoryFd);

    X11Connection& m_connection;
    void* const m_data;
    const std::size_t m_size;
    xcb_shm_seg_t m_segment = 0;
};
