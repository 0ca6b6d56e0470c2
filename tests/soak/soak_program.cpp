// SPDX-License-Identifier: Apache-2.0
#include "tests/soak/soak_controls.h"
#include "tests/soak/soak_desk.h"
#include "tests/soak/soak_meter.h"
#include "tests/soak/soak_options.h"
#include "tests/soak/soak_plant.h"
#include "tests/soak/soak_report.h"
#include "tests/soak/soak_share.h"
#include "tests/soak/soak_watchers.h"
#include "tests/x11/child_process.h"

#include <screenshare/share_engine.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <memory>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

/// Eight shares on an X server of their own for as long as one likes, with everything that a client does
/// beside them: ./dev soak. Ends with 0 when nothing grows and nothing is left over, with 1 when something
/// does, with 2 when it couldn't run, and with 77 where a program that it needs is missing.

namespace {

using Clock = std::chrono::steady_clock;
using namespace std::chrono_literals;

constexpr auto PATIENCE = 60s;

class Soak {
public:
    explicit Soak(const SoakOptions& options)
        : m_options(options),
          m_desk(options),
          m_meter(m_desk.Server(), options.Samples()),
          m_plant(options.loss, m_desk.Server().Display()) {
        // Read when the library is used for the first time.
        setenv("DISPLAY", m_desk.Server().Display().c_str(), 1);
        setenv("SCREENSHARE_PLATFORM", "x11", 1);
        setenv("SCREENSHARE_DEBUG_DIR", m_folder.Path().c_str(), 1);
    }

    /// The results are good as long as this object is.
    SoakResults Run() {
        const SoakFigures before = m_meter.Read();
        ShareEngineInit();
        SoakResults results = RunLibrary();
        ShareEngineUninit();
        m_desk.Rest();
        results.leftOver = WaitForRest(before);
        return results;
    }

private:
    SoakResults RunLibrary() {
        SoakList applications(SHARE_SOURCE_ENUMERATOR_TYPE_APP);
        SoakList monitors(SHARE_SOURCE_ENUMERATOR_TYPE_MONITOR);
        const std::vector<unsigned> displays = monitors.Ids();
        if (displays.size() != 2)
            throw std::runtime_error("there are " + std::to_string(displays.size()) + " monitors and not 2");
        StartShares(displays);
        m_controls = std::make_unique<SoakControls>(m_options, m_desk, m_shares, displays, m_counts);
        m_controls->Start();
        WarmUp();
        const Clock::time_point start = Clock::now();
        m_counts = true;
        Sample(start);
        WaitForTheLast();
        m_counts = false;
        const std::chrono::duration<double> passed = Clock::now() - start;
        m_controls->Stop();
        SoakResults results = Collect(passed);
        results.events = applications.Events() + monitors.Events();
        // Each visitor comes and goes; half of that may be missed where the machine has more to do than it
        // can.
        if (results.failure.empty() && applications.Events() < m_desk.Visits())
            results.failure = "a list of applications tells too little of who comes and goes";
        for (const auto& share : m_shares)
            share->Destroy();
        return results;
    }

    void StartShares(const std::vector<unsigned>& displays) {
        for (const SoakPlan& plan : SOAK_PLANS) {
            m_shares.push_back(
                std::make_unique<SoakShare>(plan, m_options.framesPerSecond, m_desk, m_counts));
            SoakShare& share = *m_shares.back();
            if (share.Create() != 0 || share.Prepare(displays[plan.monitor]) != 0 || share.Start() != 0)
                throw std::runtime_error(std::string("doesn't start: ") + plan.name);
        }
    }

    /// Until each share has shown something and the time is over.
    void WarmUp() {
        const Clock::time_point start = Clock::now();
        for (const auto& share : m_shares) {
            while (!share->HasShownAnything()) {
                if (Clock::now() > start + PATIENCE)
                    throw std::runtime_error(std::string("shows nothing: ") + share->Plan().name);
                Step();
            }
        }
        while (Clock::now() < start + m_options.warmUp)
            Step();
    }

    /// Until each share has been measured, and thumbnails were asked for: a short run on a busy machine.
    void WaitForTheLast() {
        const auto isMeasured = [this] {
            return m_controls->HasAskedForThumbnails() &&
                   std::all_of(m_shares.begin(), m_shares.end(),
                               [](const auto& share) { return share->Frames() > 0; });
        };
        const Clock::time_point start = Clock::now();
        while (!isMeasured() && m_controls->Failure().empty()) {
            if (Clock::now() > start + PATIENCE)
                throw std::runtime_error("a share shows nothing any more");
            Step();
        }
    }

    void Sample(Clock::time_point start) {
        constexpr auto LINE = 10s;
        Clock::time_point nextSample = start;
        Clock::time_point nextLine = start + LINE;
        for (std::size_t taken = 0; taken < m_options.Samples() && m_controls->Failure().empty();) {
            Step();
            const Clock::time_point now = Clock::now();
            if (now < nextSample)
                continue;
            m_plant.Lose();
            const SoakFigures& figures = m_meter.Sample();
            ++taken;
            nextSample = std::max(nextSample + m_options.interval, now);
            if (now < nextLine)
                continue;
            nextLine += LINE;
            Tell(std::chrono::duration_cast<std::chrono::seconds>(now - start), figures);
        }
    }

    /// Nothing is decided by how long this takes.
    void Step() {
        m_desk.Step();
        std::this_thread::sleep_for(2ms);
    }

    void Tell(std::chrono::seconds passed, const SoakFigures& figures) const {
        std::uint64_t frames = 0;
        for (const auto& share : m_shares)
            frames += share->Frames();
        std::fputs(ProgressLine(passed, figures, frames, m_controls->Pictures()).c_str(), stdout);
        std::fflush(stdout);
    }

    SoakResults Collect(std::chrono::duration<double> passed) const {
        SoakResults results;
        results.options = m_options;
        for (const auto& [counter, samples] : m_meter.Samples()) {
            const double allowed = SoakMeter::AllowedGrowth(counter);
            results.counters.push_back({counter, allowed, JudgeTrend(samples, allowed), samples});
        }
        for (const auto& share : m_shares) {
            SHARE_CAPTURE_STATISTIC statistic{};
            if (share->Engine() != nullptr)
                share->Engine()->GetShareCaptureStatistic(statistic);
            results.shares.push_back({share->Plan().name, statistic.eCaptureMode, share->Errors(),
                                      share->Frames(), static_cast<double>(share->Frames()) / passed.count(),
                                      &share->CalmJitter(), &share->LivelyJitter()});
        }
        results.calls = &m_controls->Calls();
        results.pictures = m_controls->Pictures();
        results.visits = m_desk.Visits();
        results.failure = m_controls->Failure();
        return results;
    }

    /// The server learns of what was closed a moment later.
    std::vector<std::string> WaitForRest(const SoakFigures& before) {
        const auto patience = m_options.loss == SoakLoss::Nothing ? PATIENCE : 0s;
        std::vector<std::string> left;
        ComesTrue(
            [&] {
                left = LeftOver(before, m_meter.Read());
                return left.empty();
            },
            patience);
        return left;
    }

    const SoakOptions m_options;
    const CScratchFolder m_folder;
    SoakDesk m_desk;
    SoakMeter m_meter;
    SoakPlant m_plant;
    std::atomic<bool> m_counts{false};
    SoakControls::Shares m_shares;
    std::unique_ptr<SoakControls> m_controls;
};

int Run(const SoakOptions& options) {
    if (const auto missing = MissingProgram(SoakDesk::Programs())) {
        std::printf("%s\n", missing->c_str());
        return 77;
    }
    Soak soak(options);
    const SoakResults results = soak.Run();
    std::fputs(ReportText(results).c_str(), stdout);
    if (!options.json.empty() && !WriteReport(results, options.json))
        throw std::runtime_error("can't write " + options.json);
    return results.IsGood() ? 0 : 1;
}

} // namespace

int main(int count, char** arguments) {
    try {
        return Run(ReadSoakOptions(count, arguments));
    } catch (const std::exception& failure) {
        std::fprintf(stderr, "soak: %s\n", failure.what());
        return 2;
    }
}
