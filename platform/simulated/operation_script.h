// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"

#include <array>
#include <chrono>
#include <cstddef>
#include <functional>
#include <limits>
#include <mutex>
#include <vector>

namespace platform {

/// The operations of a window server, TakeNewest being the one of its streams.
enum class SimulatedOperation {
    GetLife,
    GetCapability,
    GetPermission,
    AskPermission,
    SetNoticeReceiver,
    GetDisplays,
    GetWindows,
    GetApplications,
    GetPointerPosition,
    GetCursor,
    TakeWindowPicture,
    OpenDisplayStream,
    TakeNewest,
    Rest,
    BringToFront, // the last one: it tells how many there are
};

/// What a script has planned for the calls of each operation, and how many calls came.
/// Threads: any.
class OperationScript {
public:
    using Count = unsigned;
    static constexpr Count ALL = std::numeric_limits<Count>::max();

    /// What happens to one call, in this order.
    struct Fate {
        std::vector<std::function<void()>> actions;
        std::chrono::nanoseconds delay{0};
        bool fails = false;
        PictureOutcome outcome = PictureOutcome::Failed; ///< Of a picture that fails.
    };

    /// Counts a call.
    Fate Enter(SimulatedOperation operation);

    /// `nth` counts from the calls to come: 1 is the next one. `count` calls from there on are concerned.
    void Fail(SimulatedOperation operation, Count nth, Count count, PictureOutcome outcome);
    void Delay(SimulatedOperation operation, Count nth, Count count, std::chrono::nanoseconds delay);
    void Do(SimulatedOperation operation, Count nth, std::function<void()> action);
    /// Takes back all that is planned for an operation.
    void Heal(SimulatedOperation operation);

    Count CallsOf(SimulatedOperation operation) const;
    /// Whether anything is to happen to calls to come.
    bool HasPlans() const;

private:
    struct Rule {
        Count first = 0; // calls before the rule's first one
        Count count = 0;
        Fate fate;
    };
    struct Plan {
        Count calls = 0;
        std::vector<Rule> rules;
    };

    static constexpr auto OPERATIONS = static_cast<std::size_t>(SimulatedOperation::BringToFront) + 1;

    Plan& PlanOf(SimulatedOperation operation) { return m_plans[static_cast<std::size_t>(operation)]; }
    void Add(SimulatedOperation operation, Count nth, Count count, Fate fate);

    mutable std::mutex m_mutex;
    std::array<Plan, OPERATIONS> m_plans; // guarded by m_mutex
};

} // namespace platform
