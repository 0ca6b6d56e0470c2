// SPDX-License-Identifier: Apache-2.0
#include "bench/meter/share_cost.h"

#include "bench/meter/cpu_meter.h"

#include <chrono>
#include <cstdio>
#include <thread>

namespace {

using Clock = std::chrono::steady_clock;
using Seconds = std::chrono::duration<double>;
using Milliseconds = std::chrono::duration<double, std::milli>;

TaskTimes TimesOf(pid_t pid) {
    return pid != 0 ? ReadTaskTimes(pid) : TaskTimes();
}

} // namespace

Cost MeasureCost(const Onlooker& onlooker, pid_t server, double seconds) {
    const Clock::time_point start = Clock::now();
    const int framesBefore = onlooker.frames ? onlooker.frames() : 0;
    const TaskTimes clientBefore = TimesOf(onlooker.pid);
    const TaskTimes serverBefore = TimesOf(server);
    std::this_thread::sleep_for(Seconds(seconds));
    const SpentTime client = SpentBetween(clientBefore, TimesOf(onlooker.pid));
    const SpentTime served = SpentBetween(serverBefore, TimesOf(server));
    const double elapsed = Seconds(Clock::now() - start).count();
    const int frames = onlooker.frames ? onlooker.frames() - framesBefore : 0;
    if (client.endedTasks + served.endedTasks > 0)
        std::printf("a thread has ended meanwhile: what it spent is missing in the next line\n");
    const double ticks = elapsed * TICKS_PER_SECOND;
    Cost cost{Milliseconds(client.total).count() / ticks,
              Milliseconds(served.total).count() / ticks,
              frames / elapsed,
              {}};
    for (const auto& [thread, time] : client.byTask)
        cost.clientByThread[thread] = Milliseconds(time).count() / ticks;
    return cost;
}

void Costs::Add(const Cost& cost, double sceneAlone, double share) {
    const double net = cost.server - sceneAlone;
    client.push_back(cost.client / share);
    server.push_back(net / share);
    total.push_back((cost.client + net) / share);
    framesPerSecond.push_back(cost.framesPerSecond);
    for (const auto& [thread, time] : cost.clientByThread)
        clientByThread[thread].push_back(time / share);
}
