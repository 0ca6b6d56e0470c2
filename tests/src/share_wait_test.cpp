// SPDX-License-Identifier: Apache-2.0
#include "src/share_wait.h"
#include "src/share_sink_port.h"
#include "tests/support/call_log.h"
#include "tests/support/recording_sink.h"
#include "tests/support/threads.h"

#include <gtest/gtest.h>

#include <functional>
#include <memory>
#include <thread>

namespace {

/// An engine's way to its sink.
class CPort {
public:
    CPort() { m_port->SetSink(&m_sink); }

    /// Inside a call on the sink.
    void Call(const std::function<void()>& run) {
        EXPECT_TRUE(m_port->CallSink([&](IShareCaptureEngineSink&) { run(); }));
    }
    const std::shared_ptr<ShareSinkPort>& Share() const { return m_port; }

private:
    CCallLog m_calls;
    CRecordingSink m_sink{m_calls};
    const std::shared_ptr<ShareSinkPort> m_port = std::make_shared<ShareSinkPort>();
};

/// A thread that is inside a call on a sink and waits for an engine, as long as the object lives.
class CWaiter {
public:
    CWaiter(CPort& inside, CmThreadId worker, const CPort& port)
        : m_thread([this, &inside, worker, &port] {
              m_id = GetThreadSelfId();
              inside.Call([&] {
                  const ShareWait wait(worker, port.Share());
                  EXPECT_TRUE(wait.MayBegin());
                  m_begun.Open();
                  EXPECT_TRUE(m_done.Passes());
              });
          }) {
        EXPECT_TRUE(m_begun.Passes());
    }
    ~CWaiter() {
        m_done.Open();
        m_thread.join();
    }
    CWaiter(const CWaiter&) = delete;
    CWaiter& operator=(const CWaiter&) = delete;

    CmThreadId Id() const { return m_id; }

private:
    CmThreadId m_id = 0;
    CGate m_begun;
    CGate m_done;
    std::thread m_thread; // the last one to be made
};

bool MayWait(CmThreadId worker, const CPort& port) {
    return ShareWait(worker, port.Share()).MayBegin();
}

} // namespace

TEST(ShareWait, MayBeginWhereNobodyElseWaits) {
    const CPort port;
    EXPECT_TRUE(MayWait(0, port));
    EXPECT_TRUE(MayWait(GetThreadSelfId() + 1, port));
}

TEST(ShareWait, MayNotBeginForTheThreadItself) {
    CPort port;
    EXPECT_FALSE(MayWait(GetThreadSelfId(), port));
    port.Call([&] { EXPECT_FALSE(MayWait(0, port)); });
    EXPECT_TRUE(MayWait(0, port));
}

TEST(ShareWait, MayNotBeginForWhatWaitsForTheThreadByWayOfOthers) {
    CPort ports[3];
    CmThreadId second = 0;
    {
        const CWaiter one(ports[0], GetThreadSelfId(), ports[2]);
        const CWaiter two(ports[1], one.Id(), ports[2]);
        second = two.Id();
        EXPECT_FALSE(MayWait(second, ports[2]));
        EXPECT_FALSE(MayWait(0, ports[1]));
        EXPECT_FALSE(MayWait(0, ports[0]));
        EXPECT_TRUE(MayWait(0, ports[2]));
    }
    EXPECT_TRUE(MayWait(second, ports[1]));
}

/// Whoever waits may be called meanwhile, and so close a ring that the next one to ask isn't part of.
TEST(ShareWait, MayBeginBesideWaitsThatGoRoundByThemselves) {
    CPort a;
    CPort b;
    const ShareWait first(0, b.Share());
    EXPECT_TRUE(first.MayBegin());
    const CWaiter second(b, 0, a);
    a.Call([&] { std::thread([&] { EXPECT_TRUE(MayWait(second.Id(), a)); }).join(); });
}
