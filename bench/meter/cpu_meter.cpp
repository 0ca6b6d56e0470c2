// SPDX-License-Identifier: Apache-2.0
#include "bench/meter/cpu_meter.h"

#include <time.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <optional>
#include <sstream>
#include <system_error>

namespace {

using std::chrono::nanoseconds;

std::string NameOf(const std::filesystem::path& task) {
    std::string name;
    std::getline(std::ifstream(task / "comm"), name);
    return name;
}

std::optional<nanoseconds> TimeFromSchedstat(const std::filesystem::path& task) {
    std::ifstream file(task / "schedstat");
    long long running = 0;
    if (!(file >> running))
        return std::nullopt;
    return nanoseconds(running);
}

/// User and system time are the 12th and 13th word after the name, which may hold anything.
std::optional<nanoseconds> TimeFromStat(const std::filesystem::path& task) {
    constexpr int WORDS_BEFORE = 11;
    std::string line;
    std::getline(std::ifstream(task / "stat"), line);
    const std::size_t endOfName = line.rfind(')');
    if (endOfName == std::string::npos)
        return std::nullopt;
    std::istringstream words(line.substr(endOfName + 1));
    std::string skipped;
    for (int i = 0; i < WORDS_BEFORE; ++i)
        words >> skipped;
    long long user = 0;
    long long system = 0;
    if (!(words >> user >> system))
        return std::nullopt;
    return nanoseconds(std::chrono::seconds(1)) * (user + system) / sysconf(_SC_CLK_TCK);
}

} // namespace

TaskTimes ReadTaskTimes(pid_t pid) {
    TaskTimes times;
    std::error_code error;
    const std::filesystem::path folder = "/proc/" + std::to_string(pid) + "/task";
    for (std::filesystem::directory_iterator task(folder, error), end; !error && task != end;
         task.increment(error)) {
        std::optional<nanoseconds> time = TimeFromSchedstat(task->path());
        if (!time)
            time = TimeFromStat(task->path());
        if (time)
            times[std::stoi(task->path().filename())] = {NameOf(task->path()), *time};
    }
    return times;
}

SpentTime SpentBetween(const TaskTimes& before, const TaskTimes& after) {
    SpentTime spent;
    for (const auto& [number, task] : after) {
        const auto former = before.find(number);
        const nanoseconds time = former != before.end() ? task.time - former->second.time : task.time;
        spent.total += time;
        spent.byTask[task.name] += time;
    }
    for (const auto& each : before)
        spent.endedTasks += after.count(each.first) == 0 ? 1 : 0;
    return spent;
}

nanoseconds ReadCpuClock(pid_t pid) {
    clockid_t clock{};
    timespec time{};
    if (clock_getcpuclockid(pid, &clock) != 0 || clock_gettime(clock, &time) != 0)
        return nanoseconds(0);
    return std::chrono::seconds(time.tv_sec) + nanoseconds(time.tv_nsec);
}
