// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <functional>
#include <limits>
#include <memory>
#include <mutex>
#include <vector>

/// Planned failures of capture sessions, for tests of those who use them. A session dies of a runtime error
/// when its window server makes it: that is planned there.
namespace platform {

/// The operations that can be made to fail, and how each fails.
enum class AVCaptureOperation {
    SessionInit,                      ///< Null.
    ScreenInputInit,                  ///< Null.
    VideoDataOutputInit,              ///< Null.
    CanAddInput,                      ///< False.
    CanAddOutput,                     ///< False.
    StartRunning,                     ///< Comes back and nothing runs.
    StopRunning,                      ///< Comes back and the session still runs.
    IsVideoMinFrameDurationSupported, ///< False.
    IsVideoMaxFrameDurationSupported, ///< False.
    GetImageBuffer,                   ///< Null.
    LockBaseAddress,                  ///< kCVReturnError.
    GetBaseAddress,                   ///< Null.
    GetBytesPerRow, ///< One pixel less than a row has. The last one: it tells how many there are.
};

/// What is planned for the calls of each operation, and how many calls came.
/// Threads: any.
class AVCaptureScript {
public:
    using Count = unsigned;
    static constexpr Count ALL = std::numeric_limits<Count>::max();

    /// `nth` counts from the calls to come: 1 is the next one. `count` calls from there on fail.
    void Fail(AVCaptureOperation operation, Count nth = 1, Count count = 1);
    /// Runs `action` in the Nth call from now on, before anything else and with no lock held. What it throws
    /// leaves StartRunning and StopRunning, of which nothing has happened then; elsewhere it must not throw.
    void Do(AVCaptureOperation operation, std::function<void()> action, Count nth = 1);
    /// Takes back all that is planned for an operation.
    void Heal(AVCaptureOperation operation);

    /// Calls so far, failed ones among them.
    Count CallsOf(AVCaptureOperation operation) const;

    /// Counts a call and runs its actions; true when it is to fail.
    bool Enter(AVCaptureOperation operation);

private:
    struct Rule {
        Count first = 0; // calls before the rule's first one
        Count count = 0;
        std::function<void()> action; // null for a failure
    };
    struct Plan {
        Count calls = 0;
        std::vector<Rule> rules;
    };

    static constexpr auto OPERATIONS = static_cast<std::size_t>(AVCaptureOperation::GetBytesPerRow) + 1;

    void Add(AVCaptureOperation operation, Count nth, Rule rule);
    Plan& PlanOf(AVCaptureOperation operation) { return m_plans[static_cast<std::size_t>(operation)]; }

    mutable std::mutex m_mutex;
    std::array<Plan, OPERATIONS> m_plans; // guarded by m_mutex
};

/// Puts a script in force and gives the one that was; null for none, as it is at first.
std::shared_ptr<AVCaptureScript> ReplaceAVCaptureScript(std::shared_ptr<AVCaptureScript> script);

/// Enters a call into the script in force; false without one.
bool AVCaptureScriptFails(AVCaptureOperation operation);

} // namespace platform
