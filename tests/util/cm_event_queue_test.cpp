// SPDX-License-Identifier: Apache-2.0
#include "util/cm_event_queue.h"

#include "tests/support/threads.h"
#include "tests/support/trace_log.h"

#include <gtest/gtest.h>

#include <atomic>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

namespace {

using Record = std::vector<std::string>;

/// Writes down when it is fired and when its life ends.
class RecordingEvent final : public ICmEvent {
public:
    RecordingEvent(Record& record, std::string name, unsigned id = 0)
        : ICmEvent(id),
          m_record(record),
          m_name(std::move(name)) {}

    int OnEventFire() override {
        m_record.push_back("fire " + m_name);
        return 7;
    }

    void OnDestorySelf() override {
        m_record.push_back("end " + m_name);
        delete this;
    }

private:
    Record& m_record;
    const std::string m_name;
};

/// A queue whose owner is the test's thread.
struct OwnedQueue {
    OwnedQueue() { queue.BindToCurrentThread(); }

    int Post(Record& record, const std::string& name, int priority = CM_EVENT_PRIORITY_NORMAL) {
        return queue.PostEvent(NewEvent([&record, name] { record.push_back(name); }), priority);
    }

    void RunAll() {
        while (queue.RunOne()) {
        }
    }

    CCmEventQueue::Mark Mark() {
        const CCmWaitPoint::Lock lock = waitPoint.Acquire();
        return queue.MarkLocked();
    }

    /// False when fewer events than that have come within PATIENCE.
    bool HasTaken(CCmEventQueue::Mark count) {
        const auto limit = std::chrono::steady_clock::now() + PATIENCE;
        while (Mark() < count && std::chrono::steady_clock::now() < limit)
            std::this_thread::yield();
        return Mark() >= count;
    }

    CCmWaitPoint waitPoint;
    CCmEventQueue queue{waitPoint};
};

} // namespace

TEST(ICmEvent, CarriesItsId) {
    Record record;
    ICmEvent* const numbered = new RecordingEvent(record, "a", 42);
    EXPECT_EQ(numbered->GetId(), 42u);
    numbered->OnDestorySelf();
    ICmEvent* const plain = NewEvent([] {});
    EXPECT_EQ(plain->GetId(), 0u);
    plain->OnDestorySelf();
}

TEST(CCmEventQueue, FiresByPriorityAndThenInTheOrderOfPosting) {
    OwnedQueue owned;
    Record record;
    EXPECT_EQ(owned.Post(record, "low", CM_EVENT_PRIORITY_LOW), 0);
    EXPECT_EQ(owned.Post(record, "normal 1", CM_EVENT_PRIORITY_NORMAL), 0);
    EXPECT_EQ(owned.Post(record, "high 1", CM_EVENT_PRIORITY_HIGH), 0);
    EXPECT_EQ(owned.Post(record, "normal 2", CM_EVENT_PRIORITY_NORMAL), 0);
    EXPECT_EQ(owned.Post(record, "high 2", CM_EVENT_PRIORITY_HIGH), 0);
    owned.RunAll();
    EXPECT_EQ(record, (Record{"high 1", "high 2", "normal 1", "normal 2", "low"}));
}

TEST(CCmEventQueue, TakesPrioritiesOutsideTheEnumerationForTheNearestOne) {
    OwnedQueue owned;
    Record record;
    owned.Post(record, "low", CM_EVENT_PRIORITY_LOW);
    owned.Post(record, "beyond low", 1000);
    owned.Post(record, "high", CM_EVENT_PRIORITY_HIGH);
    owned.Post(record, "beyond high", -1000);
    owned.RunAll();
    EXPECT_EQ(record, (Record{"high", "beyond high", "low", "beyond low"}));
}

TEST(CCmEventQueue, FiresNothingBeforeItIsRun) {
    OwnedQueue owned;
    Record record;
    owned.Post(record, "posted");
    EXPECT_TRUE(record.empty());
    EXPECT_TRUE(owned.queue.RunOne());
    EXPECT_EQ(record, Record{"posted"});
    EXPECT_FALSE(owned.queue.RunOne());
}

TEST(CCmEventQueue, EndsTheLifeOfAnEventAfterItFired) {
    OwnedQueue owned;
    Record record;
    owned.queue.PostEvent(new RecordingEvent(record, "a"), CM_EVENT_PRIORITY_NORMAL);
    owned.queue.PostEvent(new RecordingEvent(record, "b"), CM_EVENT_PRIORITY_NORMAL);
    owned.RunAll();
    EXPECT_EQ(record, (Record{"fire a", "end a", "fire b", "end b"}));
}

TEST(CCmEventQueue, RefusesNoEvent) {
    OwnedQueue owned;
    EXPECT_EQ(owned.queue.PostEvent(nullptr, CM_EVENT_PRIORITY_NORMAL), -1);
    EXPECT_EQ(owned.queue.SendEvent(nullptr), -1);
    EXPECT_FALSE(owned.queue.RunOne());
}

TEST(CCmEventQueue, RefusesAndEndsEventsOnceClosed) {
    OwnedQueue owned;
    Record record;
    owned.queue.Close();
    EXPECT_EQ(owned.queue.PostEvent(new RecordingEvent(record, "posted"), CM_EVENT_PRIORITY_NORMAL), -1);
    EXPECT_EQ(owned.queue.SendEvent(new RecordingEvent(record, "sent by the owner")), -1);
    std::thread other([&] { EXPECT_EQ(owned.queue.SendEvent(new RecordingEvent(record, "sent")), -1); });
    other.join();
    EXPECT_EQ(record, (Record{"end posted", "end sent by the owner", "end sent"}));
    EXPECT_FALSE(owned.queue.RunOne());
}

TEST(CCmEventQueue, StillFiresWhatItTookBeforeItWasClosed) {
    OwnedQueue owned;
    Record record;
    owned.Post(record, "a");
    owned.Post(record, "b", CM_EVENT_PRIORITY_HIGH);
    owned.queue.Close();
    owned.RunAll();
    EXPECT_EQ(record, (Record{"b", "a"}));
}

TEST(CCmEventQueue, EndsTheLifeOfEventsThatNeverFired) {
    Record record;
    {
        OwnedQueue owned;
        owned.queue.PostEvent(new RecordingEvent(record, "a"), CM_EVENT_PRIORITY_NORMAL);
        owned.queue.PostEvent(new RecordingEvent(record, "b"), CM_EVENT_PRIORITY_LOW);
    }
    EXPECT_EQ(record, (Record{"end a", "end b"}));
}

TEST(CCmEventQueue, TracesAnExceptionOnceAndFiresTheNextEvent) {
    OwnedQueue owned;
    Record record;
    const CTraceLog log(CM_TRACE_ERROR);
    owned.queue.PostEvent(NewEvent([] { throw std::runtime_error("no paper"); }), CM_EVENT_PRIORITY_NORMAL);
    owned.queue.PostEvent(NewEvent([] { throw 5; }), CM_EVENT_PRIORITY_NORMAL);
    owned.Post(record, "next");
    owned.RunAll();
    EXPECT_EQ(record, Record{"next"});
    ASSERT_EQ(log.Lines().size(), 2u);
    EXPECT_TRUE(IsLineAt(log.Lines()[0],
                         "[[ScreenShare],[Core]] ERROR: "
                         "[CCmEventQueue::Fire]>>exception from an event: no paper",
                         "util/cm_event_queue"));
    EXPECT_TRUE(IsLineAt(log.Lines()[1],
                         "[[ScreenShare],[Core]] ERROR: "
                         "[CCmEventQueue::Fire]>>exception from an event: unknown",
                         "util/cm_event_queue"));
}

TEST(CCmEventQueue, EndsTheLifeOfAnEventThatThrew) {
    auto guest = std::make_shared<int>(0);
    OwnedQueue owned;
    owned.queue.PostEvent(NewEvent([guest] { throw std::runtime_error("no paper"); }),
                          CM_EVENT_PRIORITY_NORMAL);
    owned.RunAll();
    EXPECT_EQ(guest.use_count(), 1);
}

TEST(CCmEventQueue, LeavesEventsThatCameAfterTheMark) {
    OwnedQueue owned;
    Record record;
    const CCmEventQueue::Mark beforeAll = owned.Mark();
    owned.Post(record, "old");
    const CCmEventQueue::Mark afterOld = owned.Mark();
    owned.Post(record, "new", CM_EVENT_PRIORITY_HIGH);
    EXPECT_FALSE(owned.queue.RunOne(beforeAll));
    EXPECT_FALSE(owned.queue.RunOne(afterOld)) << "the old one must not overtake a higher priority";
    EXPECT_TRUE(owned.queue.RunOne(owned.Mark()));
    EXPECT_TRUE(owned.queue.RunOne(afterOld));
    EXPECT_EQ(record, (Record{"new", "old"}));
}

TEST(CCmEventQueue, FiresAnEventSentByItsOwnerAtOnce) {
    OwnedQueue owned;
    Record record;
    owned.Post(record, "posted");
    EXPECT_EQ(owned.queue.SendEvent(new RecordingEvent(record, "sent")), 0);
    EXPECT_EQ(record, (Record{"fire sent", "end sent"}));
    owned.RunAll();
    EXPECT_EQ(record, (Record{"fire sent", "end sent", "posted"}));
}

TEST(CCmEventQueue, FiresASentEventBehindThePostedOnesOfNormalPriority) {
    OwnedQueue owned;
    Record record;
    owned.Post(record, "low", CM_EVENT_PRIORITY_LOW);
    owned.Post(record, "normal 1");
    owned.Post(record, "normal 2");
    CTally cameBack;
    std::thread sender([&] {
        EXPECT_EQ(owned.queue.SendEvent(new RecordingEvent(record, "sent")), 0);
        cameBack.Add();
    });
    ASSERT_TRUE(owned.HasTaken(4));
    owned.Post(record, "normal 3");
    owned.queue.RunOne();
    owned.queue.RunOne();
    EXPECT_EQ(cameBack.Count(), 0);
    owned.RunAll();
    sender.join();
    EXPECT_EQ(record, (Record{"normal 1", "normal 2", "fire sent", "end sent", "normal 3", "low"}));
}

TEST(CCmEventQueue, ComesBackFromSendingOnlyAfterTheEventsEnd) {
    class DyingSlowly final : public ICmEvent {
    public:
        explicit DyingSlowly(std::atomic<bool>& ended) : m_ended(ended) {}
        int OnEventFire() override { return 0; }
        void OnDestorySelf() override {
            for (int i = 0; i < 1000; ++i)
                std::this_thread::yield();
            m_ended = true;
            delete this;
        }

    private:
        std::atomic<bool>& m_ended;
    };
    CRunningThread thread;
    for (int round = 0; round < 20; ++round) {
        std::atomic<bool> ended{false};
        ASSERT_EQ(thread->GetEventQueue()->SendEvent(new DyingSlowly(ended)), 0);
        ASSERT_TRUE(ended);
    }
}

TEST(CCmEventQueue, ComesBackFromSendingAnEventThatThrows) {
    CRunningThread thread;
    const CTraceLog log(CM_TRACE_ERROR);
    EXPECT_EQ(Send(*thread, [] { throw std::runtime_error("no paper"); }), 0);
    EXPECT_EQ(log.Lines().size(), 1u);
}

TEST(CCmEventQueue, ServesSeveralSendersAtOnce) {
    CRunningThread thread;
    int fired = 0; // touched on that thread only
    std::vector<std::thread> senders;
    for (int i = 0; i < 4; ++i) {
        senders.emplace_back([&] {
            for (int round = 0; round < 200; ++round)
                EXPECT_EQ(Send(*thread, [&fired] { ++fired; }), 0);
        });
    }
    for (std::thread& sender : senders)
        sender.join();
    Send(*thread, [&fired] { EXPECT_EQ(fired, 800); });
}
