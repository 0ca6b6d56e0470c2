// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <sys/types.h>

#include <chrono>
#include <map>
#include <string>

/// CPU time that processes spend, as the kernel counts it task by task. Wall time would tell more of the
/// other programs on the machine than of what is measured.

struct TaskTime {
    std::string name;
    std::chrono::nanoseconds time{0};
};

/// The tasks of a process at one moment, by their numbers; empty when there is no such process.
/// /proc/PID/task/TASK/schedstat counts nanoseconds, up to when the task was last taken off its CPU; where
/// the kernel keeps none, stat counts clock ticks.
using TaskTimes = std::map<pid_t, TaskTime>;
TaskTimes ReadTaskTimes(pid_t pid);

struct SpentTime {
    std::chrono::nanoseconds total{0};
    std::map<std::string, std::chrono::nanoseconds> byTask; ///< Tasks of the same name together.
    /// What a task spends between the first reading and its end is lost, so the total is too low then.
    int endedTasks = 0;
};
SpentTime SpentBetween(const TaskTimes& before, const TaskTimes& after);

/// The same of a process as a whole up to this very moment, with its tasks that run and those that have
/// ended: for operations that are over within microseconds. 0 when there is no such process.
std::chrono::nanoseconds ReadCpuClock(pid_t pid);
