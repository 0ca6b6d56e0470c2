// SPDX-License-Identifier: Apache-2.0
#include "src/share_util.h"
#include "tests/privacy/delivered_history.h"
#include "util/cm_clock.h"

#include <gtest/gtest.h>

#include <chrono>
#include <memory>

/// The part of a history that is about capture sessions: their samples come on another thread than the
/// passes, and a pass takes one that is up to two samples old.

namespace {

using namespace std::chrono_literals;

/// Keeps a worker from its passes as long as it lives.
class WorkerHold {
public:
    explicit WorkerHold(ACmThread& worker) {
        const auto held = std::make_shared<CTally>();
        EXPECT_EQ(Post(worker,
                       [gate = m_gate, held] {
                           held->Add();
                           EXPECT_TRUE(gate->Passes());
                       }),
                  0);
        EXPECT_TRUE(held->Reaches(1));
    }
    ~WorkerHold() { m_gate->Open(); }
    WorkerHold(const WorkerHold&) = delete;
    WorkerHold& operator=(const WorkerHold&) = delete;

private:
    const std::shared_ptr<CGate> m_gate = std::make_shared<CGate>();
};

} // namespace

std::shared_ptr<platform::WindowServer> DeliveredHistory::ServerOfSessions() const {
    std::shared_ptr<platform::WindowServer> server = platform::CurrentWindowServer();
    if (m_fault == DeliveredFault::StacksNotTold)
        return std::make_shared<COneStackWindowServer>(std::move(server));
    return server;
}

/// Samples come before the pass, so that it is the history that decides which ones there are: one or two, or
/// none, when the last pass has left one.
void DeliveredHistory::TakeWithSamples(std::chrono::milliseconds time, bool isDisturbed) {
    const std::shared_ptr<CScreenCaptureTaskThread> worker = WorkerOf(*m_client);
    {
        const WorkerHold hold(*worker);
        if (Chance(40)) {
            LetSamplesCome(time / 2);
            ChangeWindowMeanwhile();
            time -= time / 2;
        }
        Expect(time, isDisturbed);
        LetSamplesCome(time);
    }
    Settle(*worker);
    AwaitAllSamples(); // a session that the pass has begun anew
    TakeUpModeAgain();
}

void DeliveredHistory::LetSamplesCome(std::chrono::milliseconds time) {
    m_paced->HoldPictures(Chance(25));
    dynamic_cast<CCmManualClock&>(CmCurrentClock()).Advance(time);
    AwaitAllSamples();
    m_paced->HoldPictures(false);
}

/// Where captures have failed for long the engine goes over to the default for good.
void DeliveredHistory::TakeUpModeAgain() {
    if (m_isInAnotherMode || m_client.Statistic().eCaptureMode == m_kind.mode)
        return;
    ++m_counts.givenUp;
    Tell("take up the mode again");
    EXPECT_EQ(m_client->SetCaptureMode(m_kind.mode), 0);
    m_desk.Run(*m_client, 0ms);
}

/// A sample that doesn't open, or has too little in it.
void DeliveredHistory::DisturbSession() {
    using platform::AVCaptureOperation;
    constexpr AVCaptureOperation OPERATIONS[] = {
        AVCaptureOperation::GetImageBuffer, AVCaptureOperation::LockBaseAddress,
        AVCaptureOperation::GetBaseAddress, AVCaptureOperation::GetBytesPerRow};
    const AVCaptureOperation operation = OPERATIONS[Number(0, 3)];
    Tell("spoil a sample by operation " + std::to_string(static_cast<int>(operation)) + " of sessions");
    m_script->Fail(operation);
}
