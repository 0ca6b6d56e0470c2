// SPDX-License-Identifier: Apache-2.0
#include "platform/av_foundation_script.h"

#include "platform/one_per_process.h"

#include <algorithm>
#include <atomic>
#include <utility>

namespace platform {

namespace {

struct ScriptInForce {
    // Without a script, which is nearly always, nobody waits for a lock.
    std::atomic<bool> isThere{false};
    std::mutex mutex;
    std::shared_ptr<AVCaptureScript> script; // guarded by mutex
};

// While the library is loaded, so that no fork falls into the making.
[[maybe_unused]] const ScriptInForce& g_script = OnePerProcess<ScriptInForce>::Get();

} // namespace

void AVCaptureScript::Fail(AVCaptureOperation operation, Count nth, Count count) {
    Add(operation, nth, {0, count, nullptr});
}

void AVCaptureScript::Do(AVCaptureOperation operation, std::function<void()> action, Count nth) {
    Add(operation, nth, {0, 1, std::move(action)});
}

void AVCaptureScript::Add(AVCaptureOperation operation, Count nth, Rule rule) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    Plan& plan = PlanOf(operation);
    rule.first = plan.calls + std::max(nth, 1U) - 1;
    plan.rules.push_back(std::move(rule));
}

void AVCaptureScript::Heal(AVCaptureOperation operation) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    PlanOf(operation).rules.clear();
}

AVCaptureScript::Count AVCaptureScript::CallsOf(AVCaptureOperation operation) const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return m_plans[static_cast<std::size_t>(operation)].calls;
}

bool AVCaptureScript::Enter(AVCaptureOperation operation) {
    std::vector<std::function<void()>> actions;
    bool fails = false;
    {
        const std::lock_guard<std::mutex> lock(m_mutex);
        Plan& plan = PlanOf(operation);
        const Count call = plan.calls++;
        for (const Rule& rule : plan.rules) {
            if (call < rule.first || call - rule.first >= rule.count)
                continue;
            if (rule.action != nullptr)
                actions.push_back(rule.action);
            else
                fails = true;
        }
    }
    for (const std::function<void()>& action : actions)
        action();
    return fails;
}

std::shared_ptr<AVCaptureScript> ReplaceAVCaptureScript(std::shared_ptr<AVCaptureScript> script) {
    ScriptInForce& inForce = OnePerProcess<ScriptInForce>::Get();
    const std::lock_guard<std::mutex> lock(inForce.mutex);
    inForce.isThere = script != nullptr;
    inForce.script.swap(script);
    return script;
}

bool AVCaptureScriptFails(AVCaptureOperation operation) {
    ScriptInForce& inForce = OnePerProcess<ScriptInForce>::Get();
    if (!inForce.isThere.load())
        return false;
    std::shared_ptr<AVCaptureScript> script;
    {
        const std::lock_guard<std::mutex> lock(inForce.mutex);
        script = inForce.script;
    }
    return script != nullptr && script->Enter(operation);
}

} // namespace platform
