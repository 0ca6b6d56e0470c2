// SPDX-License-Identifier: Apache-2.0
#include "util/cm_trace.h"

#include <pthread.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <limits>
#include <mutex>
#include <new>
#include <string_view>

namespace {

constexpr int SILENT = -1;
constexpr int NOT_READ_YET = std::numeric_limits<int>::min();

/// A receiver that is in force or was. A thread that traces holds on to the slot before it makes sure that it
/// is still in force, and calls the receiver only then; so a slot that is out of force and held by nobody is
/// out of use. Slots are never freed: a late thread may look at one at any time.
struct ReceiverSlot {
    CmTraceReceiver receiver = nullptr;
    void* context = nullptr;
    std::atomic<int> inside{0};
    int waiters = 0;              // guarded by g_mutex; a slot that somebody waits for is not used again
    ReceiverSlot* next = nullptr; // constant
};

// Taken by who changes a setting and by who traces first, and not held while anything is called or waited
// for.
constinit std::mutex g_mutex;

// Changed under the mutex, read without it.
constinit std::atomic<int> g_mask{NOT_READ_YET};
constinit std::atomic<int> g_clientThreshold{SILENT};
constinit std::atomic<int> g_environmentThreshold{NOT_READ_YET};
constinit std::atomic<ReceiverSlot*> g_inForce{nullptr};

// Guarded by the mutex.
constinit ReceiverSlot* g_slots = nullptr;

// The slot whose receiver the thread is inside of.
constinit thread_local ReceiverSlot* t_inside = nullptr;

constinit std::atomic<unsigned> g_failedChecks{0};

// ---- fork

void BeforeFork() {
    g_mutex.lock();
}

void AfterForkInParent() {
    g_mutex.unlock();
}

// The other threads have not come along: nobody is inside a receiver but, perhaps, the one that forked.
void AfterForkInChild() {
    for (ReceiverSlot* slot = g_slots; slot != nullptr; slot = slot->next) {
        slot->inside.store(slot == t_inside ? 1 : 0);
        slot->waiters = 0;
    }
    g_mutex.unlock();
}

struct ForkHandlers {
    ForkHandlers() { pthread_atfork(BeforeFork, AfterForkInParent, AfterForkInChild); }
};
const ForkHandlers g_traceForkHandlers;

// ---- thresholds

int ThresholdFromEnvironment() {
    static constexpr std::array<std::string_view, 5> WORDS = {"error", "warning", "info", "debug", "detail"};
    const char* const word = std::getenv("SCREENSHARE_TRACE");
    if (word == nullptr)
        return SILENT;
    const auto found = std::find(WORDS.begin(), WORDS.end(), word);
    return found != WORDS.end() ? static_cast<int>(found - WORDS.begin()) : SILENT;
}

int UpdateMaskLocked() {
    if (g_environmentThreshold == NOT_READ_YET)
        g_environmentThreshold = ThresholdFromEnvironment();
    const int mask = std::max<int>(g_clientThreshold, g_environmentThreshold);
    g_mask.store(mask, std::memory_order_release);
    return mask;
}

// ---- standard error

/// Keeps the signal of a broken pipe from a process that may not expect it, while one of its threads writes.
class BrokenPipeGuard {
public:
    BrokenPipeGuard() {
        sigemptyset(&m_brokenPipe);
        sigaddset(&m_brokenPipe, SIGPIPE);
        sigset_t pending;
        sigpending(&pending);
        m_wasPending = sigismember(&pending, SIGPIPE) == 1;
        pthread_sigmask(SIG_BLOCK, &m_brokenPipe, &m_before);
    }
    ~BrokenPipeGuard() { pthread_sigmask(SIG_SETMASK, &m_before, nullptr); }
    BrokenPipeGuard(const BrokenPipeGuard&) = delete;
    BrokenPipeGuard& operator=(const BrokenPipeGuard&) = delete;

    /// Takes the signal that a failed write has left behind.
    void Swallow() const {
        const std::timespec now = {};
        while (!m_wasPending && sigtimedwait(&m_brokenPipe, nullptr, &now) == -1 && errno == EINTR) {
        }
    }

private:
    sigset_t m_brokenPipe;
    sigset_t m_before;
    bool m_wasPending;
};

/// In one piece, so that the lines of several threads and processes stay whole.
void WriteToStandardError(std::string_view text) {
    std::array<char, CCmTextFormator::BUFFER_SIZE> line;
    const std::size_t length = text.copy(line.data(), line.size() - 1);
    line[length] = '\n';

    const int callersErrno = errno;
    const BrokenPipeGuard guard;
    if (std::fwrite(line.data(), 1, length + 1, stderr) != length + 1 && errno == EPIPE)
        guard.Swallow();
    errno = callersErrno;
}

// ---- receiver

void LeaveSlot(ReceiverSlot& slot) {
    if (slot.inside.fetch_sub(1) == 1)
        slot.inside.notify_all();
}

/// Gives the slot in force, held until LeaveSlot; null when there is none.
ReceiverSlot* EnterSlotInForce() {
    for (;;) {
        ReceiverSlot* const slot = g_inForce.load();
        if (slot == nullptr)
            return nullptr;
        slot->inside.fetch_add(1);
        if (g_inForce.load() == slot)
            return slot;
        LeaveSlot(*slot);
    }
}

void CallReceiver(int level, const char* tag, const char* text, int length) {
    ReceiverSlot* const slot = EnterSlotInForce();
    if (slot == nullptr)
        return;
    t_inside = slot;
    try {
        slot->receiver(slot->context, level, tag, text, length);
    } catch (...) { // NOLINT(bugprone-empty-catch): a line of trace is not worth the client's process
    }
    t_inside = nullptr;
    LeaveSlot(*slot);
}

/// A slot that nobody uses, a new one if there is none; null without memory.
ReceiverSlot* UnusedSlotLocked() {
    for (ReceiverSlot* slot = g_slots; slot != nullptr; slot = slot->next) {
        if (slot != g_inForce.load() && slot->inside.load() == 0 && slot->waiters == 0)
            return slot;
    }
    auto* const slot = new (std::nothrow) ReceiverSlot;
    if (slot != nullptr) {
        slot->next = g_slots;
        g_slots = slot;
    }
    return slot;
}

ReceiverSlot* PutInForceLocked(CmTraceReceiver receiver, void* context) {
    ReceiverSlot* const slot = receiver != nullptr ? UnusedSlotLocked() : nullptr;
    if (slot != nullptr) {
        slot->receiver = receiver;
        slot->context = context;
    }
    g_inForce.store(slot);
    return slot;
}

void ChangeWaitersLocked(ReceiverSlot* slots, const ReceiverSlot* except, int change) {
    for (ReceiverSlot* slot = slots; slot != nullptr; slot = slot->next) {
        if (slot != except)
            slot->waiters += change;
    }
}

void WaitUntilEmpty(const ReceiverSlot& slot) {
    for (int inside = slot.inside.load(); inside != 0; inside = slot.inside.load())
        slot.inside.wait(inside);
}

// ---- source places

/// From the project root on, and without the suffix. The build writes paths that way already; this is for the
/// builds of others, where a path may begin anywhere on their machine.
std::string_view PathInProject(std::string_view path) {
    static constexpr std::array<std::string_view, 9> TOP_FOLDERS = {"/src/",      "/util/",    "/json/",
                                                                    "/platform/", "/include/", "/tools/",
                                                                    "/tests/",    "/bench/",   "/examples/"};
    static constexpr std::string_view MIRROR = "/tests"; // holds folders named like the top ones

    std::size_t root = std::string_view::npos;
    for (const std::string_view folder : TOP_FOLDERS) {
        const std::size_t found = path.rfind(folder);
        if (found != std::string_view::npos && (root == std::string_view::npos || found > root))
            root = found;
    }
    if (root == std::string_view::npos)
        return path.substr(path.rfind('/') + 1);
    if (path.substr(0, root).ends_with(MIRROR))
        root -= MIRROR.size();
    return path.substr(root + 1);
}

std::string_view WithoutSuffix(std::string_view path) {
    const std::size_t nameBegin = path.rfind('/') + 1;
    const std::size_t dot = path.rfind('.');
    return dot != std::string_view::npos && dot > nameBegin ? path.substr(0, dot) : path;
}

std::string_view SourcePath(const char* file) {
    std::string_view path = file != nullptr ? file : "";
    while (path.starts_with("./"))
        path.remove_prefix(2);
    if (path.starts_with('/') || path.starts_with("../"))
        path = PathInProject(path);
    return WithoutSuffix(path);
}

std::string_view LevelWord(int level) {
    switch (level) {
        case CM_TRACE_ERROR:
            return "ERROR: ";
        case CM_TRACE_WARNING:
            return "WARNING: ";
        case CM_TRACE_INFO:
            return "INFO: ";
        case CM_TRACE_DEBUG:
            return "DEBUG: ";
        case CM_TRACE_DETAIL:
            return "DETAIL: ";
        default:
            return "";
    }
}

} // namespace

int get_external_trace_mask() {
    const int mask = g_mask.load(std::memory_order_relaxed);
    if (mask != NOT_READ_YET)
        return mask;
    const std::lock_guard<std::mutex> lock(g_mutex);
    return UpdateMaskLocked();
}

void util_adapter_trace(int level, const char* tag, const char* text, int length) {
    if (level > get_external_trace_mask() || t_inside != nullptr)
        return;
    if (level < CM_TRACE_ERROR || text == nullptr || length < 0)
        return;
    if (level <= g_environmentThreshold)
        WriteToStandardError(std::string_view(text, static_cast<std::size_t>(length)));
    if (level <= g_clientThreshold)
        CallReceiver(level, tag, text, length);
}

void CmSetTraceThreshold(int threshold) {
    const std::lock_guard<std::mutex> lock(g_mutex);
    g_clientThreshold = threshold;
    UpdateMaskLocked();
}

int CmGetTraceThreshold() {
    return g_clientThreshold;
}

void CmSetTraceReceiver(CmTraceReceiver receiver, void* context) {
    std::unique_lock<std::mutex> lock(g_mutex);
    const ReceiverSlot* const inForce = PutInForceLocked(receiver, context);
    if (t_inside != nullptr)
        return;

    ReceiverSlot* const slots = g_slots;
    ChangeWaitersLocked(slots, inForce, +1);
    lock.unlock();
    for (const ReceiverSlot* slot = slots; slot != nullptr; slot = slot->next) {
        if (slot != inForce)
            WaitUntilEmpty(*slot);
    }
    lock.lock();
    ChangeWaitersLocked(slots, inForce, -1);
}

void cm_assertion_report() {
    g_failedChecks.fetch_add(1, std::memory_order_relaxed);
}

unsigned cm_assertion_count() {
    return g_failedChecks.load(std::memory_order_relaxed);
}

void CmReportFailedCheck(const char* expression, const char* file, int line) {
    if (CmTraceOn(CM_TRACE_ERROR)) {
        CCmTraceLine text(CM_TRACE_ERROR, "UTIL");
        text << SourcePath(file) << ":" << line << " Assert failed: " << expression
             << CCmSourcePlace{file, line};
        text.Write(nullptr);
    }
    cm_assertion_report();
}

CCmTextFormator& operator<<(CCmTextFormator& out, const CCmSourcePlace& place) {
    return out << "[" << SourcePath(place.file) << ":" << place.line << "]";
}

CCmTraceLine::CCmTraceLine(int level, const char* tag) : m_level(level), m_text(m_buffer, sizeof m_buffer) {
    m_text << "[" << tag << "] " << LevelWord(level);
}

void CCmTraceLine::Write(const char* tag) {
    util_adapter_trace(m_level, tag, m_text, static_cast<int>(m_text.tell()));
}
