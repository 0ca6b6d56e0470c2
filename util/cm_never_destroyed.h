// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <new>

/// Room for an object that is made with its owner and never destroyed, without touching the heap. For static
/// objects that threads may still use while the process takes its statics down.
template <class T>
class CCmNeverDestroyed {
public:
    CCmNeverDestroyed() : m_object(::new (static_cast<void*>(m_room)) T()) {}
    CCmNeverDestroyed(const CCmNeverDestroyed&) = delete;
    CCmNeverDestroyed& operator=(const CCmNeverDestroyed&) = delete;

    T& operator*() const { return *m_object; }
    T* operator->() const { return m_object; }

private:
    alignas(T) unsigned char m_room[sizeof(T)];
    T* m_object;
};
