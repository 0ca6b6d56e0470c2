// SPDX-License-Identifier: Apache-2.0
#include "src/share_frame_queue.h"

#include "src/share_frame.h"
#include "tests/support/test_effort.h"
#include "tests/support/threads.h"

#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <chrono>
#include <cstdint>
#include <iostream>
#include <map>
#include <memory>
#include <random>
#include <set>
#include <thread>
#include <vector>

// Captures that overlap, fail and come out of order, from three threads, beside one that shows the pictures.
// That faults would be noticed is shown on queues that have them.

namespace {

constexpr std::size_t CAPACITY = 5;
constexpr int CAPTURERS = 3;
constexpr unsigned SEED = 8'128;

/// Fewer pictures shown prove nothing.
constexpr long FEWEST = 100;

/// What went wrong, and what went on.
struct Findings {
    std::atomic<long> twoOwners{0};
    std::atomic<long> backwards{0};
    std::atomic<long> strange{0};
    long lost = 0;
    std::atomic<long> captures{0};
    std::atomic<long> shown{0};
};

/// The frames of a queue, and whether somebody has each.
class Owners {
public:
    template <class Queue>
    explicit Owners(Queue& queue) {
        std::vector<IShareFrame*> frames;
        while (IShareFrame* const frame = queue.popFreeFrame())
            frames.push_back(frame);
        for (IShareFrame* const frame : frames) {
            m_isOut.try_emplace(frame, false);
            queue.pushFreeFrame(frame);
        }
    }
    /// False when somebody else has it.
    bool Take(IShareFrame* frame) { return !m_isOut.at(frame).exchange(true, std::memory_order_relaxed); }
    void Give(IShareFrame* frame) { m_isOut.at(frame).store(false, std::memory_order_relaxed); }
    std::size_t Count() const { return m_isOut.size(); }

private:
    std::map<IShareFrame*, std::atomic<bool>> m_isOut;
};

template <class Queue>
class Hammer {
public:
    explicit Hammer(int rounds) : m_rounds(rounds) {}

    void Run() {
        std::vector<std::thread> capturers;
        for (int i = 0; i < CAPTURERS; ++i)
            capturers.emplace_back([this, i] { Capture(SEED + static_cast<unsigned>(i)); });
        Show();
        for (std::thread& capturer : capturers)
            capturer.join();
        std::set<IShareFrame*> found;
        while (IShareFrame* const frame = m_queue.popFreeFrame())
            found.insert(frame);
        findings.lost = static_cast<long>(CAPACITY) - static_cast<long>(found.size());
        for (IShareFrame* const frame : found)
            m_queue.pushFreeFrame(frame);
        std::cout << m_rounds << " captures by each of " << CAPTURERS << " threads, seed " << SEED << ": "
                  << findings.captures << " kept, " << findings.shown << " shown\n";
    }

    Findings findings;

private:
    void Capture(unsigned seed) {
        std::mt19937 random(seed);
        for (int i = 0; i < m_rounds || GoesOn(); ++i) {
            IShareFrame* const frame = m_queue.popFreeFrame();
            if (frame == nullptr) {
                std::this_thread::yield();
                continue;
            }
            if (!m_owners.Take(frame)) {
                ++findings.twoOwners;
                continue;
            }
            const unsigned start = ++m_now;
            frame->SetTimestamp(start); // by nobody else: a thread checker would tell
            if (random() % 8 == 0)      // seldom: where others compute, it takes as long as they are let
                std::this_thread::yield();
            const bool fails = random() % 8 == 0;
            const bool isWhole = frame->GetTimestamp() == start;
            findings.strange += isWhole ? 0 : 1;
            m_owners.Give(frame);
            if (fails) {
                m_queue.pushFreeFrame(frame);
                continue;
            }
            ++findings.captures;
            m_queue.pushCapturedFrame(frame, std::chrono::nanoseconds(start), 1, TermsOf(start));
        }
        ++m_done;
    }

    /// Whether too little has been shown yet: a busy machine may let the captures be done before.
    bool GoesOn() const { return findings.shown <= FEWEST && std::chrono::steady_clock::now() < m_deadline; }

    void Show() {
        unsigned last = 0;
        for (int turn = 0; m_done < CAPTURERS; ++turn) {
            const ShareCaptureTerms terms = TermsOf(m_now);
            IShareFrame* const frame =
                turn % 4 == 0 ? m_queue.popCapturedFrame(terms) : m_queue.popCapturedFrame();
            if (frame == nullptr) {
                std::this_thread::yield();
                continue;
            }
            if (!m_owners.Take(frame)) {
                ++findings.twoOwners;
                continue;
            }
            const unsigned start = frame->GetTimestamp();
            findings.backwards += start <= last ? 1 : 0;
            findings.strange += turn % 4 == 0 && TermsOf(start) != terms ? 1 : 0;
            last = start;
            ++findings.shown;
            m_owners.Give(frame);
            m_queue.pushFreeFrame(frame);
        }
    }

    /// Others each hundred captures.
    static ShareCaptureTerms TermsOf(unsigned start) {
        ShareCaptureTerms terms;
        terms.withdrawals = start / 100;
        return terms;
    }

    const int m_rounds;
    const std::chrono::steady_clock::time_point m_deadline = std::chrono::steady_clock::now() + PATIENCE;
    Queue m_queue{CAPACITY};
    Owners m_owners{m_queue};
    std::atomic<unsigned> m_now{0};
    std::atomic<int> m_done{0};
};

/// Hands one frame out twice now and then.
class SharingQueue : public ShareFrameQueue {
public:
    using ShareFrameQueue::ShareFrameQueue;
    IShareFrame* popFreeFrame() {
        IShareFrame* const frame = ShareFrameQueue::popFreeFrame();
        if (++m_calls % 64 == 0 && frame != nullptr)
            ShareFrameQueue::pushFreeFrame(frame);
        return frame;
    }

private:
    std::atomic<int> m_calls{0};
};

/// Keeps pictures that began before the newest one.
class DisorderlyQueue : public ShareFrameQueue {
public:
    using ShareFrameQueue::ShareFrameQueue;
    void pushCapturedFrame(IShareFrame* frame, std::chrono::nanoseconds, long usedMS,
                           const ShareCaptureTerms& terms) {
        ShareFrameQueue::pushCapturedFrame(frame, std::chrono::nanoseconds(0), usedMS, terms);
    }
};

/// Forgets a frame whose capture failed.
class LosingQueue : public ShareFrameQueue {
public:
    using ShareFrameQueue::ShareFrameQueue;
    ~LosingQueue() {
        if (IShareFrame* const lost = m_lost.load())
            ShareFrameQueue::pushFreeFrame(lost);
    }
    void pushFreeFrame(IShareFrame* frame) {
        IShareFrame* none = nullptr;
        if (++m_calls < 500 || !m_lost.compare_exchange_strong(none, frame))
            ShareFrameQueue::pushFreeFrame(frame);
    }

private:
    std::atomic<int> m_calls{0};
    std::atomic<IShareFrame*> m_lost{nullptr};
};

/// Takes any picture for one of the terms.
class CarelessQueue : public ShareFrameQueue {
public:
    using ShareFrameQueue::ShareFrameQueue;
    IShareFrame* popCapturedFrame() { return ShareFrameQueue::popCapturedFrame(); }
    IShareFrame* popCapturedFrame(const ShareCaptureTerms&) { return ShareFrameQueue::popCapturedFrame(); }
};

template <class Queue>
std::unique_ptr<Hammer<Queue>> RunHammer(int rounds) {
    auto hammer = std::make_unique<Hammer<Queue>>(rounds);
    hammer->Run();
    return hammer;
}

/// Whether some hammer finds such a fault, as soon as one does.
template <class Queue, class Finding>
bool Finds(Finding Findings::*finding) {
    constexpr int HAMMERS = 20;
    constexpr int ROUNDS = 1000;
    for (int i = 0; i < HAMMERS; ++i) {
        if (RunHammer<Queue>(ROUNDS)->findings.*finding > 0)
            return true;
    }
    return false;
}

} // namespace

TEST(FrameQueueHammer, LeavesEachFrameInOnePlaceAndPicturesInOrder) {
    const auto hammer = RunHammer<ShareFrameQueue>(TestRounds(30'000));
    const Findings& findings = hammer->findings;
    EXPECT_EQ(findings.twoOwners, 0);
    EXPECT_EQ(findings.backwards, 0);
    EXPECT_EQ(findings.strange, 0);
    EXPECT_EQ(findings.lost, 0);
    EXPECT_GT(findings.shown, FEWEST);
    EXPECT_GT(findings.captures, findings.shown);
}

TEST(FrameQueueHammer, NoticesAFrameThatTwoHave) {
    if (SCREENSHARE_TEST_SANITIZED != 0)
        GTEST_SKIP() << "it has a race";
    EXPECT_TRUE(Finds<SharingQueue>(&Findings::twoOwners));
}

TEST(FrameQueueHammer, NoticesPicturesThatGoBackwards) {
    EXPECT_TRUE(Finds<DisorderlyQueue>(&Findings::backwards));
}

TEST(FrameQueueHammer, NoticesAFrameThatIsLost) {
    EXPECT_TRUE(Finds<LosingQueue>(&Findings::lost));
}

TEST(FrameQueueHammer, NoticesAPictureOfOtherTerms) {
    EXPECT_TRUE(Finds<CarelessQueue>(&Findings::strange));
}
