// SPDX-License-Identifier: Apache-2.0
#include "platform/simulated/operation_script.h"

#include <algorithm>
#include <utility>

namespace platform {

OperationScript::Fate OperationScript::Enter(SimulatedOperation operation) {
    Fate fate;
    const std::lock_guard<std::mutex> lock(m_mutex);
    Plan& plan = PlanOf(operation);
    const Count call = plan.calls++;
    for (const Rule& rule : plan.rules) {
        if (call < rule.first || call - rule.first >= rule.count)
            continue;
        fate.actions.insert(fate.actions.end(), rule.fate.actions.begin(), rule.fate.actions.end());
        fate.delay += rule.fate.delay;
        if (rule.fate.fails && !fate.fails) {
            fate.fails = true;
            fate.outcome = rule.fate.outcome;
        }
    }
    std::erase_if(plan.rules, [next = plan.calls](const Rule& rule) {
        return rule.count != ALL && next > rule.first && next - rule.first >= rule.count;
    });
    return fate;
}

void OperationScript::Fail(SimulatedOperation operation, Count nth, Count count, PictureOutcome outcome) {
    Fate fate;
    fate.fails = true;
    fate.outcome = outcome;
    Add(operation, nth, count, std::move(fate));
}

void OperationScript::Delay(SimulatedOperation operation, Count nth, Count count,
                            std::chrono::nanoseconds delay) {
    Fate fate;
    fate.delay = std::max(delay, std::chrono::nanoseconds(0));
    Add(operation, nth, count, std::move(fate));
}

void OperationScript::Do(SimulatedOperation operation, Count nth, std::function<void()> action) {
    Fate fate;
    fate.actions.push_back(std::move(action));
    Add(operation, nth, 1, std::move(fate));
}

void OperationScript::Heal(SimulatedOperation operation) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    PlanOf(operation).rules.clear();
}

OperationScript::Count OperationScript::CallsOf(SimulatedOperation operation) const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return m_plans[static_cast<std::size_t>(operation)].calls;
}

bool OperationScript::HasPlans() const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return std::any_of(m_plans.begin(), m_plans.end(), [](const Plan& plan) { return !plan.rules.empty(); });
}

void OperationScript::Add(SimulatedOperation operation, Count nth, Count count, Fate fate) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    Plan& plan = PlanOf(operation);
    plan.rules.push_back({plan.calls + std::max(nth, 1U) - 1, count, std::move(fate)});
}

} // namespace platform
