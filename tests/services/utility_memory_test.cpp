#include "frame/services/memory.h"
#include "frame/services/strings.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <limits>
#include <memory>
#include <string>
#include <thread>
#include <vector>

namespace {

struct Tracked : Q_MemTrackedObject {
    explicit Tracked(bool fail = false)
    {
        if (fail) throw std::string("the constructor failed");
    }
    double data[5]{};
};

struct Derived : Tracked {
    double more[7]{};
};

TEST(Memory, IsCountedByTheTextOfItsLabel)
{
    char label[] = "tests: a label";  // the same text at another address than the literal below
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    void* const a = Q_AllocatePtr(1, label, 100);
    void* const b = Q_AllocatePtrClear(2, "tests: a label", 11);
    void* const c = Q_AllocatePtr(3, nullptr, 0);
    label[0] = 'X';  // the counts must not depend on the caller's buffer
    EXPECT_EQ((Q_MemoryCount{111, 2}), Q_MemoryLive("tests: a label"));
    EXPECT_EQ((Q_MemoryCount{}), Q_MemoryLive("tests: a label that nobody used"));
    EXPECT_EQ((Q_MemoryCount{before.bytes + 111, before.blocks + 3}), Q_MemoryLive(nullptr));

    struct Seen {
        Q_MemoryCount count;
        int times = 0;
    } seen;
    auto const visit = [](void* context, char const* text, Q_MemoryCount const& count) {
        if (std::strcmp(text, "tests: a label") != 0) return;
        static_cast<Seen*>(context)->count = count;
        ++static_cast<Seen*>(context)->times;
    };
    Q_ForEachMemoryLabel(visit, &seen);
    EXPECT_EQ(1, seen.times);
    EXPECT_EQ((Q_MemoryCount{111, 2}), seen.count);

    for (void* const block : {a, b, c}) {
        EXPECT_EQ(0u, reinterpret_cast<std::uintptr_t>(block) % 16);
        Q_FreePtr(block);
    }
    Q_FreePtr(nullptr);
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
}

TEST(Memory, HandlesAreZeroedAndKnowTheirSize)
{
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    for (std::size_t const size : {0u, 1u, 16u, 1000u}) {
        char** const handle = Q_AllocateHandleClear(1, "tests: handle", size);
        ASSERT_NE(nullptr, handle);
        EXPECT_EQ(size, Q_GetHandleSize(handle));
        EXPECT_EQ(0u, reinterpret_cast<std::uintptr_t>(*handle) % 16);
        EXPECT_EQ(std::string(size, 0), std::string(*handle, size));
        std::memset(*handle, 0x5A, size);  // all of it is the caller's: the sanitizer looks on
        Q_FreeHandle(handle);
    }
    Q_FreeHandle(nullptr);
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
}

TEST(Memory, ImpossibleSizesAreRefused)
{
    std::size_t const greatest = std::numeric_limits<std::size_t>::max();
    EXPECT_EQ(nullptr, Q_AllocatePtr(1, "tests: huge", greatest));
    EXPECT_EQ(nullptr, Q_AllocateHandleClear(1, "tests: huge", greatest - 8));
    EXPECT_EQ(nullptr, hearth::allocator::MemoryRecycler::Allocate(greatest, nullptr));
    EXPECT_THROW(Q_Allocator<double>().allocate(greatest / 4), std::bad_alloc);
    EXPECT_THROW(hearth::allocator::RecyclingAllocator<double>().allocate(greatest / 4), std::bad_alloc);
    EXPECT_EQ((Q_MemoryCount{}), Q_MemoryLive("tests: huge"));
}

TEST(Memory, AccountingBooksWithoutAllocating)
{
    Q_MemoryCount const before = Q_MemoryLive(Q_AccountedElsewhere);
    Q_AccountAllocationEx(4096, 1);
    EXPECT_EQ((Q_MemoryCount{before.bytes + 4096, before.blocks + 1}), Q_MemoryLive(Q_AccountedElsewhere));
    Q_AccountAllocationEx(4096, 0);
    EXPECT_EQ(before, Q_MemoryLive(Q_AccountedElsewhere));
}

TEST(Memory, TrackedObjectsShowAndGoAlsoWhenTheirConstructorFails)
{
    Q_MemoryCount const before = Q_MemoryLive(Q_MemTrackedObject::Label);
    {
        auto const object = std::make_unique<Derived>();
        Q_MemoryCount const now = Q_MemoryLive(Q_MemTrackedObject::Label);
        EXPECT_EQ(before.blocks + 1, now.blocks);
        EXPECT_EQ(before.bytes + static_cast<long long>(sizeof(Derived)), now.bytes);
    }
    EXPECT_THROW(new Tracked(true), std::string);
    EXPECT_EQ(before, Q_MemoryLive(Q_MemTrackedObject::Label));
}

// Every way to get memory, each of which must notice the failure that is injected, and leave nothing behind.
struct Way {
    char const* why;
    bool (*succeeds)();  // tries once and cleans up
};

// The answer of a call, or false if it was refused memory.
bool Gets(bool (*call)())
{
    try {
        return call();
    } catch (std::bad_alloc const&) {
        return false;
    }
}

template <auto Allocate, auto Free>
bool GetsBlock()
{
    auto* const block = Allocate(1, "tests: n-th", 8);
    Free(block);
    return block != nullptr;
}

bool GetsObject()
{
    delete new Tracked;
    return true;
}

Way const Ways[] = {
    {"block", GetsBlock<Q_AllocatePtr, Q_FreePtr>},
    {"zeroed block", GetsBlock<Q_AllocatePtrClear, Q_FreePtr>},
    {"handle", GetsBlock<Q_AllocateHandleClear, Q_FreeHandle>},
    {"object", GetsObject},
    {"container", [] { return std::vector<int, Q_Allocator<int>>(5).size() == 5; }},
    {"string", [] { return u16str(100, 'x').size() == 100; }},
};

TEST(Memory, TheNthAllocationFailsAndOnlyThatOne)
{
    for (Way const& way : Ways)
        for (int n = 1; n <= 3; ++n) {
            SCOPED_TRACE(testing::Message() << way.why << " " << n);
            Q_MemoryCount const before = Q_MemoryLive(nullptr);
            Q_FailAllocation(n);
            for (int i = 1; i <= 5; ++i) {
                EXPECT_EQ(i >= n + 1, Q_FailAllocationFired()) << "before allocation " << i;
                EXPECT_EQ(i != n, Gets(way.succeeds)) << "allocation " << i;
            }
            Q_FailAllocation(0);
            EXPECT_FALSE(Q_FailAllocationFired());
            EXPECT_TRUE(Gets(way.succeeds));
            EXPECT_EQ(before, Q_MemoryLive(nullptr));
        }
}

TEST(Memory, AFailureIsTheBusinessOfOneThread)
{
    Q_FailAllocation(1);
    std::thread([] { EXPECT_TRUE(Gets(Ways[0].succeeds)); }).join();
    EXPECT_FALSE(Q_FailAllocationFired());
    EXPECT_FALSE(Gets(Ways[0].succeeds));
    Q_FailAllocation(0);
}

TEST(Memory, ThreadsThatMeetNewLabelsAgreeOnThem)
{
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    constexpr int Labels = 60;
    auto const name = [](int i) { return "tests: contended " + std::to_string(i); };
    std::vector<std::vector<void*>> blocks(4);
    std::vector<std::thread> threads;
    for (std::vector<void*>& mine : blocks)
        threads.emplace_back([&] {
            for (int i = 0; i < Labels; ++i) mine.push_back(Q_AllocatePtr(1, name(i).c_str(), 10));
        });
    for (std::thread& thread : threads) thread.join();
    for (int i = 0; i < Labels; ++i) EXPECT_EQ((Q_MemoryCount{40, 4}), Q_MemoryLive(name(i).c_str())) << i;
    for (std::vector<void*> const& some : blocks)
        for (void* const block : some) Q_FreePtr(block);  // on another thread than the one that allocated it
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
}

TEST(Memory, RecycledBlocksMayBeReturnedByEitherSize)
{
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    for (std::size_t size = 0; size < 70; ++size)
        for (bool const byGranted : {false, true}) {
            std::size_t granted = 0;
            void* const block = hearth::allocator::MemoryRecycler::Allocate(size, &granted);
            ASSERT_NE(nullptr, block);
            ASSERT_GE(granted, size);
            std::memset(block, 1, granted);
            hearth::allocator::MemoryRecycler::Recycle(block, byGranted ? granted : size);
        }
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
}

}  // namespace
