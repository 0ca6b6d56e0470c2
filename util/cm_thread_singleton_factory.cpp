// SPDX-License-Identifier: Apache-2.0
#include "util/cm_never_destroyed.h"
#include "util/cm_thread.h"

#include <unistd.h>

#include <algorithm>
#include <exception>
#include <iterator>

/// Ends the threads of the process's factory when the process exits. A forked child has none of them.
class ACmThreadSingletonFactory::EndAtExit {
public:
    explicit EndAtExit(ACmThreadSingletonFactory& factory) : m_factory(factory) {}
    ~EndAtExit() {
        if (m_process == getpid())
            m_factory.End();
    }
    EndAtExit(const EndAtExit&) = delete;
    EndAtExit& operator=(const EndAtExit&) = delete;

private:
    ACmThreadSingletonFactory& m_factory;
    const pid_t m_process = getpid();
};

ACmThreadSingletonFactory* ACmThreadSingletonFactory::Instance() {
    // While the process exits, engines that nobody has stopped still post to the threads that they hold.
    static const CCmNeverDestroyed<ACmThreadSingletonFactory> factory;
    static const EndAtExit endAtExit(*factory);
    return &*factory;
}

ACmThreadSingletonFactory::~ACmThreadSingletonFactory() {
    End();
}

int ACmThreadSingletonFactory::GetSingletonThread(const char* name, ACmThread*& thread) {
    thread = nullptr;
    if (name == nullptr)
        return -1;
    JoinRetired();
    const std::lock_guard<std::mutex> lock(m_mutex);
    if (m_ended)
        return -1;
    const Entries::iterator found = Find(name);
    Entry* const entry = found != m_entries.end() ? &*found : Start(name);
    if (entry == nullptr)
        return -1;
    ++entry->count;
    thread = entry->thread.get();
    return 0;
}

int ACmThreadSingletonFactory::ResleseSingletonThread(const char* name, ACmThread* thread) {
    if (name == nullptr || thread == nullptr)
        return -1;
    JoinRetired();
    bool known = false;
    Entries last = TakeIfLast(name, thread, known);
    if (last.empty())
        return known ? 0 : -1;
    thread->Stop(nullptr);
    if (thread->Destory(0) == 0)
        return 0;
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_retired.splice(m_retired.end(), last);
    return 0;
}

ACmThreadSingletonFactory::Entries::iterator ACmThreadSingletonFactory::Find(const char* name) {
    return std::find_if(m_entries.begin(), m_entries.end(),
                        [name](const Entry& entry) { return entry.name == name; });
}

/// Under the lock, so that a name never has two threads; nobody's code but the loop's start runs meanwhile.
ACmThreadSingletonFactory::Entry* ACmThreadSingletonFactory::Start(const char* name) {
    try {
        Entries started;
        started.push_back({name, std::make_shared<KRNUTIL::ComTaskThread>(), 0});
        if (started.front().thread->Create(name, 1, 1, 0) != 0)
            return nullptr;
        m_entries.splice(m_entries.end(), started);
        return &m_entries.back();
    } catch (const std::exception&) {
        return nullptr;
    }
}

/// Counts one holder of the pair less, and gives the entry if that was the last.
ACmThreadSingletonFactory::Entries ACmThreadSingletonFactory::TakeIfLast(const char* name,
                                                                         const ACmThread* thread,
                                                                         bool& known) {
    Entries taken;
    const std::lock_guard<std::mutex> lock(m_mutex);
    const Entries::iterator entry = Find(name);
    known = entry != m_entries.end() && entry->thread.get() == thread;
    if (known && --entry->count == 0)
        taken.splice(taken.end(), m_entries, entry);
    return taken;
}

/// Only those that have ended: the caller may hold what an event of the others waits for.
void ACmThreadSingletonFactory::JoinRetired() {
    Entries ended;
    {
        const std::lock_guard<std::mutex> lock(m_mutex);
        for (Entries::iterator entry = m_retired.begin(); entry != m_retired.end();) {
            const Entries::iterator next = std::next(entry);
            if (entry->thread->HasEnded())
                ended.splice(ended.end(), m_retired, entry);
            entry = next;
        }
    }
    for (const Entry& entry : ended)
        entry.thread->Join();
}

void ACmThreadSingletonFactory::End() {
    Entries held;
    Entries retired;
    {
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_ended = true;
        held.swap(m_entries);
        retired.swap(m_retired);
    }
    for (const Entry& entry : held)
        entry.thread->Stop(nullptr);
    for (const Entries* entries : {&held, &retired}) {
        for (const Entry& entry : *entries)
            entry.thread->Destory(0);
    }
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_entries.swap(held);
}
