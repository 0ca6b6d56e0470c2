// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/av_foundation.h"
#include "platform/av_foundation_run.h"

#include <atomic>
#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>
#include <vector>

namespace platform {

/// What a session is, shared with its run, which may outlive the session by a moment.
/// Threads: any.
class CaptureSessionCore final : public SampleRunOwner,
                                 public std::enable_shared_from_this<CaptureSessionCore> {
public:
    // ---- Configuration
    void BeginConfiguration();
    void CommitConfiguration();
    bool CanAdd(const std::shared_ptr<AVCaptureScreenInput>& input) const;
    bool CanAdd(const std::shared_ptr<AVCaptureVideoDataOutput>& output) const;
    /// These may throw std::bad_alloc, and nothing has happened then.
    void Add(const std::shared_ptr<AVCaptureScreenInput>& input);
    void Add(const std::shared_ptr<AVCaptureVideoDataOutput>& output);
    void Remove(const std::shared_ptr<AVCaptureScreenInput>& input);
    void Remove(const std::shared_ptr<AVCaptureVideoDataOutput>& output);
    bool IsBeingConfigured() const;

    // ---- Life
    bool IsRunning() const { return m_running.load() != 0; }
    void Start();
    void Stop();
    /// The session ends. Tells nobody.
    void End();
    /// See RestCaptureSessions.
    void Sleep();
    void Awake();

    // ---- SampleRunOwner
    std::optional<SamplePlan> GetPlan() override;
    void OnRunDied(std::uint64_t serial, const NSError& error) override;

private:
    using Lock = std::lock_guard<std::mutex>;

    void ConnectLocked(const std::shared_ptr<AVCaptureConnection>& connection);
    void DisconnectLocked();
    std::optional<NSError> StartRunLocked();
    std::optional<NSError> TryToStartRunLocked();
    void ForgetRun(const std::shared_ptr<SampleRun>& run);
    void Post(AVCaptureNotificationName name, const NSError& error = {});

    mutable std::mutex m_mutex;
    // Guarded by m_mutex.
    int m_configurations = 0;
    std::shared_ptr<AVCaptureScreenInput> m_input;
    std::shared_ptr<AVCaptureVideoDataOutput> m_output;
    std::shared_ptr<AVCaptureConnection> m_connection;

    // The serial of the run that is under way; 0 when the session doesn't run. Whoever takes it away ends
    // the running, and tells so.
    std::atomic<std::uint64_t> m_running{0};

    // Not held while a run is waited for, nor while anybody is told of something.
    std::mutex m_lifeMutex;
    // Guarded by m_lifeMutex.
    std::uint64_t m_lastSerial = 0;
    std::shared_ptr<SampleRun> m_run; // perhaps one that has died
    bool m_asleep = false;            // runs, but has no run
};

/// The sessions of the process, and the runs that couldn't be waited for where they ended. Threads: any.
class CaptureSessionList {
public:
    static CaptureSessionList& Get();

    void Add(const std::shared_ptr<CaptureSessionCore>& core);
    void Remove(const std::weak_ptr<CaptureSessionCore>& core);
    std::vector<std::shared_ptr<CaptureSessionCore>> All();

    /// Ends a run, and waits for that if `canWait`.
    void EndRun(const std::shared_ptr<SampleRun>& run, bool canWait);
    /// Waits for the runs that were not waited for.
    void JoinAll();

private:
    template <class Choice>
    void JoinRuns(const Choice& choice);

    std::mutex m_mutex;
    // Guarded by m_mutex.
    std::vector<std::weak_ptr<CaptureSessionCore>> m_sessions;
    std::vector<std::shared_ptr<SampleRun>> m_unjoined;
};

/// Tells the observers of a session.
void PostCaptureNotification(const CaptureSessionCore* core, const AVCaptureNotification& notification);

} // namespace platform
