// SPDX-License-Identifier: Apache-2.0
#include "util/qvn_unknown_impl.h"

#include "tests/support/test_effort.h"

#include <gtest/gtest.h>
#include <screenshare/qvn_unknown.h>

#include <array>
#include <atomic>
#include <barrier>
#include <cstddef>
#include <cstring>
#include <iostream>
#include <numeric>
#include <thread>
#include <vector>

namespace {

constexpr std::size_t THREADS = 4;

/// What a counted object leaves behind.
struct Remains {
    std::atomic<int> destroyed{0};
    long sumOfMarks = 0;
};

/// Built as every counted object of the library is: the interface first, the count second.
class CCounted final : public qvn::IQvnUnknown, public qvn::CQvnUnknownImpl {
public:
    explicit CCounted(Remains& remains) : m_remains(remains) {}

    unsigned AddRef() override { return AddRefImpl(); }
    unsigned Release() override { return ReleaseImpl(); }
    int QueryInterface(const qvn::_tagUUID& iid, void** object) override {
        return QueryInterfaceImpl(iid, object);
    }
    unsigned GetReference() override { return GetReferenceImpl(); }

    /// Plain memory: whoever destroys the object must see what the other holders wrote before they let go.
    std::array<long, THREADS> marks{};

private:
    ~CCounted() override {
        m_remains.sumOfMarks = std::accumulate(marks.begin(), marks.end(), 0L);
        ++m_remains.destroyed;
    }

    Remains& m_remains;
};

/// Place of a virtual operation in the table, as the C++ ABI of this platform encodes it in a member pointer.
template <class Operation>
std::size_t SlotOf(Operation operation) {
    std::ptrdiff_t encoded[2];
    static_assert(sizeof encoded == sizeof operation);
    std::memcpy(encoded, &operation, sizeof encoded);
    return static_cast<std::size_t>(encoded[0] - 1) / sizeof(void*);
}

} // namespace

TEST(QvnUnknown, HasItsOperationsBehindTheTwoDestructors) {
    EXPECT_EQ(SlotOf(&qvn::IQvnUnknown::AddRef), 2u);
    EXPECT_EQ(SlotOf(&qvn::IQvnUnknown::Release), 3u);
    EXPECT_EQ(SlotOf(&qvn::IQvnUnknown::QueryInterface), 4u);
    EXPECT_EQ(SlotOf(&qvn::IQvnUnknown::GetReference), 5u);
}

TEST(QvnUnknown, ComparesIdsByteByByte) {
    static_assert(sizeof(qvn::_tagUUID) == 16);
    const unsigned char expected[16] = {0x00, 0x00, 0x00, 0x00, 0x13, 0x20, 0x14, 0x01,
                                        0x01, 0x23, 0x45, 0x67, 0x89, 0xAB, 0xCD, 0xEF};
    EXPECT_EQ(std::memcmp(&QVNIID_IQvnUnknown, expected, sizeof expected), 0);
    EXPECT_TRUE(QVNIID_IQvnUnknown == qvn::QVNIID_IQvnUnknown);
    for (std::size_t i = 0; i < sizeof expected; ++i) {
        qvn::_tagUUID other = QVNIID_IQvnUnknown;
        EXPECT_TRUE(other == QVNIID_IQvnUnknown);
        other.bytes[i] ^= 0x80;
        EXPECT_FALSE(other == QVNIID_IQvnUnknown) << "byte " << i;
        EXPECT_TRUE(other != QVNIID_IQvnUnknown) << "byte " << i;
    }
}

TEST(QvnUnknown, StartsWithNoReference) {
    Remains remains;
    auto* const object = new CCounted(remains);
    EXPECT_EQ(object->GetReference(), 0u);
    EXPECT_EQ(object->AddRef(), 1u);
    EXPECT_EQ(object->Release(), 0u);
    EXPECT_EQ(remains.destroyed, 1);
}

TEST(QvnUnknown, LivesUntilTheLastReferenceIsGivenUp) {
    Remains remains;
    qvn::IQvnUnknown* const object = new CCounted(remains);
    EXPECT_EQ(object->AddRef(), 1u);
    EXPECT_EQ(object->AddRef(), 2u);
    EXPECT_EQ(object->AddRef(), 3u);
    EXPECT_EQ(object->Release(), 2u);
    EXPECT_EQ(object->GetReference(), 2u);
    EXPECT_EQ(object->Release(), 1u);
    EXPECT_EQ(remains.destroyed, 0);
    EXPECT_EQ(object->Release(), 0u);
    EXPECT_EQ(remains.destroyed, 1);
}

TEST(QvnUnknown, GivesItsCountingPartForTheRootId) {
    Remains remains;
    auto* const object = new CCounted(remains);
    object->AddRef();
    void* part = nullptr;
    EXPECT_EQ(object->QueryInterface(QVNIID_IQvnUnknown, &part), 0);
    EXPECT_EQ(part, static_cast<qvn::CQvnUnknownImpl*>(object));
    EXPECT_NE(part, static_cast<qvn::IQvnUnknown*>(object));
    EXPECT_EQ(object->GetReference(), 2u);
    object->Release();
    EXPECT_EQ(object->Release(), 0u);
}

TEST(QvnUnknown, RefusesEveryOtherIdWithANullPart) {
    Remains remains;
    auto* const object = new CCounted(remains);
    object->AddRef();
    for (std::size_t i = 0; i < 16; ++i) {
        qvn::_tagUUID other = QVNIID_IQvnUnknown;
        other.bytes[i] ^= 0x80;
        void* part = &remains;
        EXPECT_EQ(object->QueryInterface(other, &part), 0x46004005) << "byte " << i;
        EXPECT_EQ(part, nullptr) << "byte " << i;
        EXPECT_EQ(object->GetReference(), 1u) << "byte " << i;
    }
    object->Release();
}

TEST(QvnUnknown, RefusesANullOutPointer) {
    Remains remains;
    auto* const object = new CCounted(remains);
    object->AddRef();
    EXPECT_EQ(object->QueryInterface(QVNIID_IQvnUnknown, nullptr), 0x46004006);
    EXPECT_EQ(object->QueryInterface(qvn::_tagUUID{}, nullptr), 0x46004006);
    EXPECT_EQ(object->GetReference(), 1u);
    object->Release();
}

TEST(QvnUnknown, IsDestroyedOnceWhenManyThreadsShareIt) {
    const int objects = 100 * TestEffort();
    constexpr int PAIRS = 2000;
    std::cout << "objects: " << objects << ", threads: " << THREADS << ", no seed\n";
    for (int i = 0; i < objects; ++i) {
        Remains remains;
        auto* const object = new CCounted(remains);
        for (std::size_t holder = 0; holder < THREADS; ++holder)
            object->AddRef();
        std::barrier start(static_cast<std::ptrdiff_t>(THREADS)); // so that they really run side by side
        std::vector<std::thread> threads;
        for (std::size_t holder = 0; holder < THREADS; ++holder) {
            threads.emplace_back([&start, object, holder] {
                start.arrive_and_wait();
                for (int pair = 0; pair < PAIRS; ++pair) {
                    object->AddRef();
                    object->Release();
                }
                object->marks[holder] = static_cast<long>(holder) + 1;
                object->Release();
            });
        }
        for (std::thread& thread : threads)
            thread.join();
        ASSERT_EQ(remains.destroyed, 1);
        ASSERT_EQ(remains.sumOfMarks, 1 + 2 + 3 + 4);
    }
}
