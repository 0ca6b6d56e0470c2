// SPDX-License-Identifier: Apache-2.0
#include "platform/av_foundation_core.h"

#include "platform/av_foundation_life.h"
#include "platform/one_per_process.h"
#include "platform/platform_thread.h"
#include "util/cm_guarded_call.h"

#include <algorithm>
#include <new>
#include <utility>

namespace platform {

namespace {

using std::chrono::nanoseconds;

// While the library is loaded, so that no fork falls into the making.
[[maybe_unused]] const CaptureSessionList& g_sessions = CaptureSessionList::Get();

/// Nothing for what is no time above zero.
std::optional<nanoseconds> ToNanoseconds(const CMTime& time) {
    constexpr double SECOND = 1e9;
    constexpr double SHORTEST = SECOND / 1000;
    constexpr double LONGEST = SECOND * 3600;
    if (time.timescale < 1 || time.value < 1)
        return std::nullopt;
    const double wanted = static_cast<double>(time.value) / time.timescale * SECOND;
    return nanoseconds(static_cast<nanoseconds::rep>(std::clamp(wanted, SHORTEST, LONGEST)));
}

nanoseconds PeriodOf(const AVCaptureScreenInput& input, const AVCaptureConnection& connection) {
    const nanoseconds wanted = ToNanoseconds(input.minFrameDuration()).value_or(SampleLook().period);
    return std::max(wanted, ToNanoseconds(connection.videoMinFrameDuration()).value_or(wanted));
}

} // namespace

// ---- Configuration

void CaptureSessionCore::BeginConfiguration() {
    const Lock lock(m_mutex);
    ++m_configurations;
}

void CaptureSessionCore::CommitConfiguration() {
    const Lock lock(m_mutex);
    m_configurations = std::max(m_configurations - 1, 0);
}

bool CaptureSessionCore::IsBeingConfigured() const {
    const Lock lock(m_mutex);
    return m_configurations > 0;
}

bool CaptureSessionCore::CanAdd(const std::shared_ptr<AVCaptureScreenInput>& input) const {
    const Lock lock(m_mutex);
    return input != nullptr && m_input == nullptr;
}

bool CaptureSessionCore::CanAdd(const std::shared_ptr<AVCaptureVideoDataOutput>& output) const {
    const Lock lock(m_mutex);
    return output != nullptr && m_output == nullptr;
}

void CaptureSessionCore::Add(const std::shared_ptr<AVCaptureScreenInput>& input) {
    const auto connection = std::make_shared<AVCaptureConnection>();
    const Lock lock(m_mutex);
    if (input == nullptr || m_input != nullptr)
        return;
    m_input = input;
    ConnectLocked(connection);
}

void CaptureSessionCore::Add(const std::shared_ptr<AVCaptureVideoDataOutput>& output) {
    const auto connection = std::make_shared<AVCaptureConnection>();
    const Lock lock(m_mutex);
    if (output == nullptr || m_output != nullptr)
        return;
    m_output = output;
    ConnectLocked(connection);
}

void CaptureSessionCore::ConnectLocked(const std::shared_ptr<AVCaptureConnection>& connection) {
    if (m_input == nullptr || m_output == nullptr)
        return;
    m_connection = connection;
    m_output->SetConnection(connection);
}

void CaptureSessionCore::DisconnectLocked() {
    m_connection = nullptr;
    if (m_output != nullptr)
        m_output->SetConnection(nullptr);
}

void CaptureSessionCore::Remove(const std::shared_ptr<AVCaptureScreenInput>& input) {
    const Lock lock(m_mutex);
    if (input == nullptr || m_input != input)
        return;
    DisconnectLocked();
    m_input = nullptr;
}

void CaptureSessionCore::Remove(const std::shared_ptr<AVCaptureVideoDataOutput>& output) {
    const Lock lock(m_mutex);
    if (output == nullptr || m_output != output)
        return;
    DisconnectLocked();
    m_output = nullptr;
}

std::optional<SamplePlan> CaptureSessionCore::GetPlan() {
    const Lock lock(m_mutex);
    if (m_configurations > 0)
        return std::nullopt;
    SamplePlan plan;
    if (m_connection == nullptr)
        return plan;
    plan.look.display = m_input->displayID();
    plan.look.period = PeriodOf(*m_input, *m_connection);
    plan.look.crop = m_input->cropRect();
    plan.look.scale = m_input->scaleFactor();
    plan.look.withPointer = m_input->capturesCursor();
    plan.look.format = m_output->PixelFormat();
    plan.removesDuplicates = m_input->removesDuplicateFrames();
    plan.discardsLate = m_output->alwaysDiscardsLateVideoFrames();
    AVCaptureVideoDataOutput::Delivery delivery = m_output->GetDelivery();
    plan.target = {std::move(delivery.delegate), std::move(delivery.queue), m_output, m_connection};
    return plan;
}

// ---- Life

/// An error is why there is no run; the session doesn't run then.
std::optional<NSError> CaptureSessionCore::StartRunLocked() {
    std::optional<NSError> error;
    m_asleep = OnEndingPlatformThread();
    if (m_asleep) {
        if (!IsRunning())
            m_running = ++m_lastSerial;
        return error;
    }
    const bool done = CmCallGuarded("[CaptureSessionCore::StartRunLocked]>>exception: ",
                                    [&] { error = TryToStartRunLocked(); });
    if (!done || error)
        m_running = 0;
    if (!done)
        error = NSError{"The session could not be started."};
    return error;
}

std::optional<NSError> CaptureSessionCore::TryToStartRunLocked() {
    const auto run = std::make_shared<SampleRun>(shared_from_this(), ++m_lastSerial);
    if (std::optional<NSError> error = run->Prepare())
        return error;
    m_running = run->Serial(); // before there is a thread that could die
    if (run->Create("scn-sample", 0, 0, 0) != 0)
        return NSError{"There is no thread for the session."};
    m_run = run;
    return std::nullopt;
}

void CaptureSessionCore::Start() {
    std::shared_ptr<SampleRun> former;
    std::optional<NSError> error;
    bool wasRunning = false;
    {
        const Lock life(m_lifeMutex);
        wasRunning = IsRunning();
        if (wasRunning && !m_asleep)
            return;
        former = std::move(m_run);
        error = StartRunLocked();
    }
    CaptureSessionList::Get().EndRun(former, !IsInsideSession());
    if (error)
        Post(AVCaptureSessionRuntimeErrorNotification, *error);
    if (wasRunning == error.has_value())
        Post(error ? AVCaptureSessionDidStopRunningNotification
                   : AVCaptureSessionDidStartRunningNotification);
}

void CaptureSessionCore::Stop() {
    std::shared_ptr<SampleRun> run;
    bool wasRunning = false;
    {
        const Lock life(m_lifeMutex);
        run = m_run; // stays there, so that whoever stops at the same time waits, too
        m_asleep = false;
        wasRunning = m_running.exchange(0) != 0;
        if (run != nullptr)
            run->Delivery().Close();
    }
    CaptureSessionList::Get().EndRun(run, !IsInsideSession());
    ForgetRun(run);
    if (wasRunning)
        Post(AVCaptureSessionDidStopRunningNotification);
}

void CaptureSessionCore::ForgetRun(const std::shared_ptr<SampleRun>& run) {
    std::shared_ptr<SampleRun> forgotten; // ends behind the lock
    const Lock life(m_lifeMutex);
    if (m_run == run)
        forgotten.swap(m_run);
}

void CaptureSessionCore::End() {
    std::shared_ptr<SampleRun> run;
    {
        const Lock life(m_lifeMutex);
        run = std::move(m_run);
        m_asleep = false;
        m_running = 0;
    }
    CaptureSessionList::Get().EndRun(run, !IsInsideSession());
    CaptureSessionList::Get().Remove(weak_from_this());
    // A run that wasn't waited for may keep this object for a while, but nothing of its clients.
    std::shared_ptr<AVCaptureScreenInput> input;
    std::shared_ptr<AVCaptureVideoDataOutput> output;
    const Lock lock(m_mutex);
    DisconnectLocked();
    input.swap(m_input);
    output.swap(m_output);
}

void CaptureSessionCore::Sleep() {
    std::shared_ptr<SampleRun> run;
    {
        const Lock life(m_lifeMutex);
        run = std::move(m_run);
        // Not if it has died: nothing is to go on then.
        std::uint64_t serial = run != nullptr ? run->Serial() : 0;
        if (run != nullptr && m_running.compare_exchange_strong(serial, m_lastSerial + 1)) {
            ++m_lastSerial;
            m_asleep = true;
        }
    }
    CaptureSessionList::Get().EndRun(run, !OnPlatformThread());
}

void CaptureSessionCore::Awake() {
    std::optional<NSError> error;
    {
        const Lock life(m_lifeMutex);
        if (!m_asleep)
            return;
        error = StartRunLocked();
    }
    if (!error)
        return;
    Post(AVCaptureSessionRuntimeErrorNotification, *error);
    Post(AVCaptureSessionDidStopRunningNotification);
}

void CaptureSessionCore::OnRunDied(std::uint64_t serial, const NSError& error) {
    // Not of a run that was told to end meanwhile.
    if (!m_running.compare_exchange_strong(serial, 0))
        return;
    Post(AVCaptureSessionRuntimeErrorNotification, error);
    Post(AVCaptureSessionDidStopRunningNotification);
}

void CaptureSessionCore::Post(AVCaptureNotificationName name, const NSError& error) {
    PostCaptureNotification(this, {name, {error}});
}

// ---- All sessions

CaptureSessionList& CaptureSessionList::Get() {
    return OnePerProcess<CaptureSessionList>::Get();
}

void CaptureSessionList::Add(const std::shared_ptr<CaptureSessionCore>& core) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_sessions.push_back(core);
}

void CaptureSessionList::Remove(const std::weak_ptr<CaptureSessionCore>& core) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    std::erase_if(m_sessions, [&](const std::weak_ptr<CaptureSessionCore>& each) {
        return !each.owner_before(core) && !core.owner_before(each);
    });
}

std::vector<std::shared_ptr<CaptureSessionCore>> CaptureSessionList::All() {
    std::vector<std::shared_ptr<CaptureSessionCore>> all;
    const std::lock_guard<std::mutex> lock(m_mutex);
    for (const std::weak_ptr<CaptureSessionCore>& session : m_sessions) {
        if (std::shared_ptr<CaptureSessionCore> core = session.lock())
            all.push_back(std::move(core));
    }
    return all;
}

void CaptureSessionList::EndRun(const std::shared_ptr<SampleRun>& run, bool canWait) {
    if (run == nullptr)
        return;
    run->Stop(nullptr);
    run->Delivery().Close();
    if (canWait) {
        run->Join();
        run->Delivery().WaitForCalls();
        return;
    }
    JoinRuns([](const SampleRun& each) { return each.HasEnded(); });
    // Without memory the thread, which keeps itself, is joined by whoever starts another one.
    CmCallGuarded("[CaptureSessionList::EndRun]>>exception: ", [&] {
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_unjoined.push_back(run);
    });
}

void CaptureSessionList::JoinAll() {
    JoinRuns([](const SampleRun&) { return true; });
}

template <class Choice>
void CaptureSessionList::JoinRuns(const Choice& choice) {
    for (;;) {
        std::shared_ptr<SampleRun> run;
        {
            const std::lock_guard<std::mutex> lock(m_mutex);
            const auto found = std::find_if(m_unjoined.begin(), m_unjoined.end(),
                                            [&](const auto& each) { return choice(*each); });
            if (found == m_unjoined.end())
                return;
            run = std::move(*found);
            m_unjoined.erase(found);
        }
        run->Join();
    }
}

void RestCaptureSessions() noexcept {
    CmCallGuarded("[RestCaptureSessions]>>exception: ", [] {
        for (const std::shared_ptr<CaptureSessionCore>& core : CaptureSessionList::Get().All())
            core->Sleep();
        if (!OnPlatformThread())
            CaptureSessionList::Get().JoinAll();
    });
}

void WakeCaptureSessions() noexcept {
    CmCallGuarded("[WakeCaptureSessions]>>exception: ", [] {
        for (const std::shared_ptr<CaptureSessionCore>& core : CaptureSessionList::Get().All())
            core->Awake();
    });
}

} // namespace platform
