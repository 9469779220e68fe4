#include "frame/services/memory.h"
#include "frame/services/sequence.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <climits>
#include <cstdint>
#include <cstring>
#include <random>
#include <utility>
#include <vector>

namespace {

// A list of ints in items of a given size; the int stands at the front and the rest of an item is its shadow, so that a
// move that loses bytes shows.
class IntList {
public:
    explicit IntList(short itemSize = 8, std::vector<int> const& values = {})
    {
        EXPECT_EQ(0, SEQ_New(0, itemSize, 4, 1, &list_));
        for (int const value : values) EXPECT_EQ(0, SEQ_Insert(Item(value).data(), -1, list_));
    }
    explicit IntList(SEQ_Head** list) : list_(list) {}
    IntList(IntList const&) = delete;
    IntList& operator=(IntList const&) = delete;
    ~IntList()
    {
        if (list_) SEQ_Dispose(list_, 0);
    }

    SEQ_Head** get() const { return list_; }
    SEQ_Head** release() { return std::exchange(list_, nullptr); }
    int Count() const { return (*list_)->count; }

    std::vector<unsigned char> Item(int value) const
    {
        std::vector<unsigned char> item(static_cast<std::size_t>((*list_)->itemSize));
        for (std::size_t i = 0; i < item.size(); ++i)
            item[i] = static_cast<unsigned char>(value * 31 + static_cast<int>(i));
        std::memcpy(item.data(), &value, std::min(item.size(), sizeof value));
        return item;
    }

    // The values, read item by item; -1 for an item whose shadow is wrong.
    std::vector<int> Values() const
    {
        std::vector<int> values;
        for (int i = 0; i < Count(); ++i) {
            void const* address = nullptr;
            EXPECT_EQ(0, SEQ_GetConstAddress(list_, i, &address));
            int value = 0;
            std::memcpy(&value, address, std::min<std::size_t>(sizeof value, Item(0).size()));
            values.push_back(std::memcmp(address, Item(value).data(), Item(value).size()) == 0 ? value : -1);
        }
        return values;
    }

private:
    SEQ_Head** list_ = nullptr;
};

int CompareInts(void*, SEQ_Head const* const*, void const* a, void const* b)
{
    int left, right;
    std::memcpy(&left, a, sizeof left);
    std::memcpy(&right, b, sizeof right);
    return (left > right) - (left < right);
}

void SetSort(SEQ_Head** list, SEQ_SortFunc sort = CompareInts)
{
    SEQ_Funcs const funcs{nullptr, nullptr, sort};
    ASSERT_EQ(0, SEQ_SetFuncs(list, 3, &funcs));
}

// ---- search

TEST(SequenceSearch, AgreesWithTheStandardLibraryAtEveryCount)
{
    std::mt19937 random(11);
    for (int count = 0; count < 70; ++count) {
        std::vector<int> items(static_cast<std::size_t>(count));
        for (int& item : items) item = static_cast<int>(random() % 60) * 2;
        std::sort(items.begin(), items.end());
        IntList const list(count % 2 ? 8 : 12, items);
        SetSort(list.get());
        for (int probe = -1; probe <= 121; ++probe) {
            auto const place = std::lower_bound(items.begin(), items.end(), probe);
            unsigned char found = 0;
            int index = -1;
            ASSERT_EQ(0, SEQ_GetSortedConstItem(list.get(), 0, list.Item(probe).data(), &found, 0, &index));
            ASSERT_EQ(place - items.begin(), index) << count << " items, probe " << probe;
            ASSERT_EQ(place != items.end() && *place == probe, found == 1) << count << " items, probe " << probe;
        }
    }
}

// ---- indices

TEST(SequenceIndex, OnlyIndicesInTheListAreTaken)
{
    int const asked[] = {INT_MIN, INT_MIN + 1, -2, -1, 0, 1, 2, 3, INT_MAX};
    for (int const count : {0, 1, 3})
        for (int const index : asked) {
            SCOPED_TRACE(testing::Message() << count << " items, index " << index);
            std::vector<int> values(static_cast<std::size_t>(count));
            for (int i = 0; i < count; ++i) values[static_cast<std::size_t>(i)] = 100 + i;
            IntList const list(8, values);
            bool const inList = index >= 0 && index < count;
            bool const namesLast = index == -1 && count > 0;

            void* item = nullptr;
            void const* constItem = nullptr;
            unsigned char copy[8];
            int const code = inList ? 0 : SEQ_Err_BadIndex;
            EXPECT_EQ(code, SEQ_GetAddress(list.get(), index, 1, &item));
            EXPECT_EQ(inList ? 1 : 0, SEQ_GetPinCount(list.get())) << "a failure owes no unlock";
            EXPECT_EQ(namesLast ? 0 : code, SEQ_GetConstAddress(list.get(), index, &constItem));
            EXPECT_EQ(inList, item != nullptr && item == constItem);
            if (constItem) {
                int const wanted = namesLast ? values.back() : values[static_cast<std::size_t>(index)];
                EXPECT_EQ(0, std::memcmp(list.Item(wanted).data(), constItem, 8));
            }
            EXPECT_EQ(code, SEQ_GetItemCopy(list.get(), 0, index, copy));
            if (!inList) {
                auto const unvisited = [](SEQ_Head**, long, int, void*) { return 77; };
                EXPECT_EQ(code, SEQ_SetItemCopy(list.Item(5).data(), index, list.get(), 0, 0));
                EXPECT_EQ(code, SEQ_Remove(index, list.get(), 0, nullptr));
                EXPECT_EQ(code, SEQ_ForRange(list.get(), index, index, 0, unvisited, nullptr));
            }
            bool const insertable = index >= -1 && index <= count;
            EXPECT_EQ(insertable ? 0 : SEQ_Err_BadIndex, SEQ_InsertCopy(list.Item(5).data(), index, list.get(), 0));
            EXPECT_EQ(insertable ? count + 1 : count, list.Count());
        }
}

TEST(SequenceNew, RefusesItemSizesThatAreNone)
{
    for (short const size : {SHRT_MIN, -1, 0}) {
        SEQ_Head** list = nullptr;
        EXPECT_EQ(SEQ_Err_BadArgument, SEQ_New(0, size, 4, 1, &list));
        EXPECT_EQ(nullptr, list);
    }
}

TEST(SequenceFuncs, NullLeavesAndRemoveTakesAway)
{
    IntList const list(8, {1, 2, 3});
    unsigned char found = 0;
    int index = 0;
    auto const search = [&] { return SEQ_GetSortedItem(list.get(), 0, list.Item(9).data(), &found, 0, &index); };

    SetSort(list.get());
    EXPECT_EQ(0, search());
    EXPECT_EQ(3, index);
    SEQ_Funcs const removeOthers{SEQ_RemoveFunc, SEQ_RemoveFunc, nullptr};
    EXPECT_EQ(0, SEQ_SetFuncs(list.get(), 3, &removeOthers));
    EXPECT_EQ(0, search());
    EXPECT_EQ(3, index) << "the sort function stays";
    SetSort(list.get(), [](void*, SEQ_Head const* const*, void const* a, void const* b) {
        return CompareInts(nullptr, nullptr, b, a);
    });
    EXPECT_EQ(0, search());
    EXPECT_EQ(0, index) << "the other order";
    SetSort(list.get(), SEQ_RemoveFunc);
    found = 77;
    index = 77;
    EXPECT_EQ(SEQ_Err_NoSortFunc, search());
    EXPECT_EQ(std::pair(77, 77), std::pair(int{found}, index)) << "nothing is answered";
}

// ---- an item of the list as the source

TEST(SequenceEdits, AnItemOfTheListCanBeTheSource)
{
    std::vector<int> const start = {11, 22, 33, 44};  // a full first block: the insertion moves it
    for (bool const full : {false, true})
        for (int from = 0; from < 4; ++from)
            for (int to = 0; to <= 4; ++to) {
                IntList const list(24, start);
                if (!full) SEQ_ReserveSpace(40, list.get());
                void const* source = nullptr;
                ASSERT_EQ(0, SEQ_GetConstAddress(list.get(), from, &source));
                ASSERT_EQ(0, SEQ_InsertCopy(source, to, list.get(), 0));
                std::vector<int> wanted = start;
                wanted.insert(wanted.begin() + to, start[static_cast<std::size_t>(from)]);
                EXPECT_EQ(wanted, list.Values()) << "from " << from << " to " << to;

                ASSERT_EQ(0, SEQ_GetConstAddress(list.get(), from, &source));
                ASSERT_EQ(0, SEQ_SetItemCopy(source, to, list.get(), 0, 0));
                wanted[static_cast<std::size_t>(to)] = wanted[static_cast<std::size_t>(from)];
                EXPECT_EQ(wanted, list.Values()) << "set from " << from << " to " << to;
            }
}

// ---- walking

TEST(SequenceWalk, ARangeGoesEitherWayAndStopsOnOrder)
{
    const struct {
        int first, last, stopAt;
        std::vector<int> visited;
        int code, lastVisited;
    } walks[] = {
        {3, 1, -1, {3, 2, 1}, 0, 1},           {1, 3, -1, {1, 2, 3}, 0, 3}, {2, 2, -1, {2}, 0, 2},
        {0, 4, 2, {0, 1, 2}, 99, 2},           {4, 0, 4, {4}, 99, 4},       {0, 5, -1, {}, SEQ_Err_BadIndex, 77},
        {-1, 2, -1, {}, SEQ_Err_BadIndex, 77},
    };
    static std::vector<int> visited;
    IntList const list(8, {100, 101, 102, 103, 104});
    for (auto const& walk : walks) {
        SCOPED_TRACE(testing::Message() << walk.first << " to " << walk.last << ", stop at " << walk.stopAt);
        visited.clear();
        int lastVisited = 77;
        auto const visit = [](SEQ_Head** handle, long stopAt, int index, void* item) {
            void const* address = nullptr;
            EXPECT_EQ(0, SEQ_GetConstAddress(handle, index, &address));
            EXPECT_EQ(address, item);
            visited.push_back(index);
            return index == stopAt ? 99 : 0;
        };
        EXPECT_EQ(walk.code, SEQ_ForRange(list.get(), walk.first, walk.last, walk.stopAt, visit, &lastVisited));
        EXPECT_EQ(walk.visited, visited);
        EXPECT_EQ(walk.lastVisited, lastVisited);
        EXPECT_EQ(0, SEQ_GetPinCount(list.get()));
    }
}

TEST(SequenceWalk, ForEachFollowsAListThatShrinksUnderIt)
{
    IntList const list(8, {1, 2, 3, 4, 5, 6});
    auto const removeEven = [](SEQ_Head** handle, long, int index, void* item) {
        int value;
        std::memcpy(&value, item, sizeof value);
        return value % 2 == 0 ? SEQ_Remove(index, handle, 0, nullptr) : 0;
    };
    EXPECT_EQ(0, SEQ_ForEach(list.get(), 0, removeEven, 0));
    EXPECT_EQ((std::vector<int>{1, 3, 5}), list.Values());

    long visits = 0;
    auto const countTo2 = [](SEQ_Head const* const*, long refcon, int index, void const*) {
        ++*reinterpret_cast<long*>(refcon);
        return index == 1 ? 42 : 0;
    };
    EXPECT_EQ(42, SEQ_ForEachConst(list.get(), reinterpret_cast<long>(&visits), countTo2, 0));
    EXPECT_EQ(2, visits);
}

// ---- pins and room

TEST(SequencePins, NestAndNeverFallBelowZero)
{
    IntList const list(8, {1});
    SEQ_Head** const handle = list.get();
    void* item = nullptr;
    std::vector<int> const pinned = {SEQ_Lock(1, handle), SEQ_LockConst(1, handle), SEQ_GetAddress(handle, 0, 1, &item),
                                     SEQ_GetAddress(handle, 0, 0, &item), SEQ_GetPinCount(handle)};
    EXPECT_EQ((std::vector<int>{0, 0, 0, 0, 3}), pinned);
    std::vector<int> const unpinned = {SEQ_Unlock(handle), SEQ_UnlockConst(handle), SEQ_Unlock(handle),
                                       SEQ_Unlock(handle), SEQ_UnlockConst(handle), SEQ_GetPinCount(handle)};
    EXPECT_EQ((std::vector<int>{0, 0, 0, SEQ_Err_NotPinned, SEQ_Err_NotPinned, 0}), unpinned);
    EXPECT_EQ(0, SEQ_Lock(1, handle));
    EXPECT_EQ(1, SEQ_GetPinCount(handle)) << "a surplus unlock isn't paid for later";
}

TEST(SequencePins, HoldAddressesThroughEverythingButGrowth)
{
    IntList const list(8, {1, 2, 3});
    ASSERT_EQ(0, SEQ_ReserveSpace(10, list.get()));
    void* pinned = nullptr;
    ASSERT_EQ(0, SEQ_GetAddress(list.get(), 0, 1, &pinned));
    EXPECT_EQ(0, SEQ_Compact(list.get()));
    for (int i = 0; i < 7; ++i) EXPECT_EQ(0, SEQ_InsertCopy(list.Item(9).data(), -1, list.get(), 0));
    EXPECT_EQ(0, SEQ_SetItemCopy(list.Item(4).data(), 2, list.get(), 0, 0));
    EXPECT_EQ(0, SEQ_SetNumItems(2, list.get(), 0));
    void* again = nullptr;
    ASSERT_EQ(0, SEQ_GetAddress(list.get(), 0, 0, &again));
    EXPECT_EQ(pinned, again);
    EXPECT_EQ((std::vector<int>{1, 2}), list.Values());
}

TEST(SequenceRoom, ReservedRoomNeedsNoMemoryAndCompactReturnsIt)
{
    IntList const list(104);
    Q_MemoryCount const empty = Q_MemoryLive(nullptr);
    ASSERT_EQ(0, SEQ_ReserveSpace(50, list.get()));
    EXPECT_EQ(empty.bytes + 50 * 104, Q_MemoryLive(nullptr).bytes);
    Q_FailAllocation(1);
    for (int i = 0; i < 50; ++i) ASSERT_EQ(0, SEQ_Insert(list.Item(i).data(), 0, list.get()));
    EXPECT_FALSE(Q_FailAllocationFired());
    EXPECT_EQ(4, SEQ_Insert(list.Item(50).data(), -1, list.get()));
    EXPECT_EQ(50, list.Count());
    ASSERT_EQ(0, SEQ_SetNumItems(7, list.get(), 0));
    ASSERT_EQ(0, SEQ_Compact(list.get()));
    EXPECT_EQ(empty.bytes + 7 * 104, Q_MemoryLive(nullptr).bytes);
    ASSERT_EQ(0, SEQ_SetNumItems(0, list.get(), 0));
    ASSERT_EQ(0, SEQ_Compact(list.get()));
    EXPECT_EQ(empty, Q_MemoryLive(nullptr));
}

TEST(SequenceRoom, ADuplicateOfPlainBytesIsOneBlockAndGrowsLikeAnyList)
{
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    for (short const itemSize : {4, 8, 12, 33}) {
        IntList const source(itemSize, {5, 6, 7});
        for (int removed = 0; removed <= 3; ++removed) {
            Q_MemoryCount const between = Q_MemoryLive(nullptr);
            SEQ_Head** made = nullptr;
            ASSERT_EQ(0, SEQ_Duplicate(source.get(), 0, &made));
            IntList const copy(made);
            EXPECT_EQ(between.blocks + 1, Q_MemoryLive(nullptr).blocks);
            EXPECT_EQ((std::vector<int>{5, 6, 7}), copy.Values());
            for (int i = 0; i < removed; ++i) ASSERT_EQ(0, SEQ_Remove(0, made, 0, nullptr));
            ASSERT_EQ(0, SEQ_Compact(made));
            Q_FailAllocation(1);
            for (int i = 0; i < removed; ++i) EXPECT_EQ(0, SEQ_Insert(copy.Item(i).data(), -1, made));
            EXPECT_FALSE(Q_FailAllocationFired()) << "room is reused";
            EXPECT_EQ(4, SEQ_Insert(copy.Item(9).data(), -1, made));
            std::vector<int> expected{5, 6, 7};
            expected.erase(expected.begin(), expected.begin() + removed);
            for (int i = 0; i < removed; ++i) expected.push_back(i);
            EXPECT_EQ(expected, copy.Values()) << "a failure changes nothing";
            for (int i = 0; i < 20; ++i) ASSERT_EQ(0, SEQ_Insert(copy.Item(i).data(), 0, made));
            for (int i = 0; i < 20; ++i) expected.insert(expected.begin(), i);
            EXPECT_EQ(expected, copy.Values());
            ASSERT_EQ(0, SEQ_Compact(made));
            EXPECT_EQ(expected, copy.Values());
        }
    }
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
}

TEST(SequenceRoom, ALargeDuplicateThatGrowsKeepsNoRoomThatItLeft)
{
    IntList const source(1000);
    for (int i = 0; i < 100; ++i) ASSERT_EQ(0, SEQ_Insert(source.Item(i).data(), -1, source.get()));
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    SEQ_Head** made = nullptr;
    ASSERT_EQ(0, SEQ_Duplicate(source.get(), 0, &made));
    IntList const copy(made);
    auto const head = Q_MemoryLive(nullptr).bytes - before.bytes - 100 * 1000;
    ASSERT_EQ(0, SEQ_Insert(copy.Item(100).data(), -1, made));
    ASSERT_EQ(0, SEQ_Compact(made));
    EXPECT_EQ(before.bytes + head + 101 * 1000, Q_MemoryLive(nullptr).bytes);
    for (int i = 100; i > 0; --i) ASSERT_EQ(0, SEQ_Remove(i, made, 0, nullptr));
    ASSERT_EQ(0, SEQ_Compact(made));
    EXPECT_EQ(before.bytes + head + 1000, Q_MemoryLive(nullptr).bytes);

    for (int n = 1; n <= 2; ++n) {
        SEQ_Head** none = nullptr;
        Q_MemoryCount const between = Q_MemoryLive(nullptr);
        Q_FailAllocation(n);
        EXPECT_EQ(4, SEQ_Duplicate(source.get(), 0, &none));
        EXPECT_TRUE(Q_FailAllocationFired());
        EXPECT_EQ(nullptr, none);
        EXPECT_EQ(between, Q_MemoryLive(nullptr));
    }
}

TEST(SequenceRoom, NumbersInItemsAreAlignedAndWholeSizesLeaveNoGaps)
{
    for (short const itemSize : {1, 4, 8, 9, 16, 24, 61, 104, 600}) {
        IntList const list(itemSize, {1, 2, 3, 4, 5, 6, 7});
        std::vector<std::uintptr_t> addresses;
        for (int i = 0; i < list.Count(); ++i) {
            void const* item = nullptr;
            ASSERT_EQ(0, SEQ_GetConstAddress(list.get(), i, &item));
            addresses.push_back(reinterpret_cast<std::uintptr_t>(item));
            EXPECT_EQ(0u, addresses.back() % 8) << "size " << itemSize << ", item " << i;
            if (itemSize % 8 == 0) {
                EXPECT_EQ(addresses[0] + static_cast<std::uintptr_t>(i) * static_cast<std::uintptr_t>(itemSize),
                          addresses.back());
            }
        }
        EXPECT_EQ(0u, addresses[0] % 16);
    }
}

TEST(SequenceRoom, NewItemsAreZeroAlsoWhereOldOnesLay)
{
    IntList const list(8, {1, 2, 3, 4, 5});
    ASSERT_EQ(0, SEQ_SetNumItems(1, list.get(), 0));
    ASSERT_EQ(0, SEQ_SetNumItems(20, list.get(), 0));
    std::vector<unsigned char> const zero(8);
    for (int i = 1; i < 20; ++i) {
        void const* item = nullptr;
        ASSERT_EQ(0, SEQ_GetConstAddress(list.get(), i, &item));
        EXPECT_EQ(0, std::memcmp(zero.data(), item, 8)) << i;
    }
    EXPECT_EQ(SEQ_Err_BadArgument, SEQ_SetNumItems(-1, list.get(), 0));
    EXPECT_EQ(20, list.Count());
}

TEST(SequenceRoom, AppendingMovesTheItemsARareNumberOfTimes)
{
    IntList const list(16);
    int moves = 0;
    void const* last = nullptr;
    for (int i = 0; i < 100000; ++i) {
        ASSERT_EQ(0, SEQ_Insert(list.Item(i).data(), -1, list.get()));
        void const* first = nullptr;
        SEQ_GetConstAddress(list.get(), 0, &first);
        moves += first != last;
        last = first;
    }
    EXPECT_LE(moves, 30);
}

TEST(SequenceHandle, NullIsRefusedEverywhere)
{
    SEQ_Head **const none = nullptr, **made = nullptr;
    SEQ_Funcs funcs{};
    void* item = nullptr;
    void const* constItem = nullptr;
    int number = 0;
    unsigned char found = 0;
    auto const visit = [](SEQ_Head**, long, int, void*) { return 0; };
    std::vector<int> const codes = {SEQ_Dispose(none, 0),
                                    SEQ_Duplicate(none, 0, &made),
                                    SEQ_SetFuncs(none, 3, &funcs),
                                    SEQ_SetRefcon(nullptr, none),
                                    SEQ_Lock(1, none),
                                    SEQ_Unlock(none),
                                    SEQ_GetAddress(none, 0, 1, &item),
                                    SEQ_GetConstAddress(none, 0, &constItem),
                                    SEQ_GetItemCopy(none, 0, 0, &number),
                                    SEQ_SetItemCopy(&number, 0, none, 0, 0),
                                    SEQ_InsertCopy(&number, 0, none, 0),
                                    SEQ_Remove(0, none, 0, nullptr),
                                    SEQ_GetSortedItem(none, 0, &number, &found, 0, &number),
                                    SEQ_ForEach(none, 0, visit, 0),
                                    SEQ_ReserveSpace(1, none),
                                    SEQ_Compact(none),
                                    SEQ_SetNumItems(1, none, 0)};
    EXPECT_EQ(std::vector<int>(17, SEQ_Err_BadList), codes);
}

}  // namespace
