// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <sys/eventfd.h>
#include <unistd.h>

#include <cerrno>
#include <deque>
#include <functional>
#include <mutex>
#include <system_error>
#include <utility>

// The way from the library's threads to the main one. They only say what is to be done, and never wait for
// it: the library holds locks of its own while it calls back.
class Mailbox {
public:
    using Letter = std::function<void()>;

    Mailbox() : m_count(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK | EFD_SEMAPHORE)) {
        if (m_count < 0)
            throw std::system_error(errno, std::generic_category(), "no mailbox");
    }
    ~Mailbox() { close(m_count); }
    Mailbox(const Mailbox&) = delete;
    Mailbox& operator=(const Mailbox&) = delete;

    // Readable while there is a letter.
    int Descriptor() const { return m_count; }

    // On any thread. Nothing may be thrown out of a callback: without memory the program ends here.
    void Post(Letter letter) noexcept {
        {
            const std::lock_guard<std::mutex> lock(m_mutex);
            m_letters.push_back(std::move(letter));
        }
        eventfd_write(m_count, 1);
    }

    // On the main thread: does what the oldest letter says, if there is one.
    void OpenOne() {
        eventfd_t one = 0;
        if (eventfd_read(m_count, &one) != 0)
            return;
        const Letter letter = TakeOldest();
        letter();
    }

private:
    Letter TakeOldest() {
        const std::lock_guard<std::mutex> lock(m_mutex);
        Letter letter = std::move(m_letters.front());
        m_letters.pop_front();
        return letter;
    }

    const int m_count; // of letters
    std::mutex m_mutex;
    std::deque<Letter> m_letters; // guarded by m_mutex
};
