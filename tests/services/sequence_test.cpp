// Lists against a vector under random scripts, with items that own something and everything that can fail failing; and
// the few rules that no script comes by.
#include "tests/services/chunkbytes.h"
#include "tests/support/codes.h"
#include "tests/support/dice.h"

#include "frame/services/memory.h"
#include "frame/services/sequence.h"

#include <algorithm>
#include <climits>
#include <cstring>
#include <functional>
#include <vector>

namespace {

constexpr int CopyFailed = 501, DisposeFailed = 502;

// What items own: each holds the number of a token, 0 for none. Copies and disposals can be made to fail.
struct Tokens {
    std::vector<int> values = {0};  // by token; -1 once disposed
    int failCopyIn = 0, failDisposeIn = 0;

    int Make(int value)
    {
        values.push_back(value);
        return static_cast<int>(values.size()) - 1;
    }
    int ValueIn(void const* item) const
    {
        int token;
        std::memcpy(&token, item, sizeof token);
        return values.at(static_cast<std::size_t>(token));
    }
    auto Alive() const
    {
        return std::count_if(
            values.begin() + 1, values.end(), [](int value) { return value >= 0; });
    }
};

bool Falls(int& countdown)
{
    return countdown > 0 && --countdown == 0;
}

int Copy(void* refcon, SEQ_Head const* const* list, void const* source, void* destination)
{
    Tokens& tokens = *static_cast<Tokens*>(refcon);
    EXPECT_EQ(refcon, (*list)->refcon) << "the function finds the owner from the list it is given";
    if (Falls(tokens.failCopyIn)) return CopyFailed;
    int const value = tokens.ValueIn(source);
    EXPECT_GE(value, 0) << "copied after disposal";
    int const token = value == 0 ? 0 : tokens.Make(value);
    std::memcpy(destination, source, static_cast<std::size_t>((*list)->itemSize));
    std::memcpy(destination, &token, sizeof token);
    return 0;
}

int Dispose(void* refcon, SEQ_Head**, void* item)
{
    Tokens& tokens = *static_cast<Tokens*>(refcon);
    if (Falls(tokens.failDisposeIn)) return DisposeFailed;
    int token;
    std::memcpy(&token, item, sizeof token);
    EXPECT_GE(tokens.values.at(static_cast<std::size_t>(token)), 0) << "disposed twice";
    if (token != 0) tokens.values[static_cast<std::size_t>(token)] = -1;
    return 0;
}

int Compare(void*, SEQ_Head const* const*, void const* a, void const* b)
{
    int left, right;
    std::memcpy(&left, a, sizeof left);
    std::memcpy(&right, b, sizeof right);
    return (left > right) - (left < right);
}

// An item: a number, and behind it bytes that follow from the value, so that a move that loses bytes shows.
std::string Item(std::size_t size, int number, int value)
{
    std::string item(size, '\0');
    for (std::size_t i = 0; value != 0 && i < size; ++i) item[i] = static_cast<char>(value * 31 + static_cast<int>(i));
    std::memcpy(item.data(), &number, std::min(size, sizeof number));
    return item;
}

class List {
public:
    explicit List(int itemSize, std::vector<int> const& values = {}) : size_(static_cast<std::size_t>(itemSize))
    {
        EXPECT_EQ(0, SEQ_New(0, static_cast<short>(itemSize), 4, 1, &list_));
        for (int const value : values) EXPECT_EQ(0, SEQ_Insert(Item(size_, value, value).data(), -1, list_));
    }
    List(List const&) = delete;
    List& operator=(List const&) = delete;
    ~List() { EXPECT_EQ(0, SEQ_Dispose(list_, 0)); }
    operator SEQ_Head**() const { return list_; }
    void const* At(int index) const
    {
        void const* item = nullptr;
        EXPECT_EQ(0, SEQ_GetConstAddress(list_, index, &item));
        return item;
    }
    // The numbers, read item by item; -1 where the bytes behind are wrong.
    std::vector<int> Values(Tokens const* tokens = nullptr, SEQ_Head** other = nullptr) const
    {
        std::vector<int> values;
        SEQ_Head** const list = other ? other : list_;
        for (int i = 0; i < (*list)->count; ++i) {
            void const* item = nullptr;
            EXPECT_EQ(0, SEQ_GetConstAddress(list, i, &item));
            int number = 0;
            std::memcpy(&number, item, std::min(size_, sizeof number));
            int const value = tokens ? tokens->ValueIn(item) : number;
            values.push_back(std::memcmp(item, Item(size_, number, value).data(), size_) == 0 ? value : -1);
        }
        return values;
    }

private:
    std::size_t size_;
    SEQ_Head** list_ = nullptr;
};

// Each edit may be made to fail by a copy, by a disposal or for want of memory. The list must then be what it was, with
// nothing leaked and nothing disposed twice.
class Script {
public:
    Script(int itemSize, bool owns)
        : dice_(static_cast<std::uint64_t>(itemSize)),
          size_(static_cast<std::size_t>(itemSize)),
          owns_(owns),
          list_(itemSize)
    {
        SEQ_Funcs const funcs{owns ? Copy : nullptr, owns ? Dispose : nullptr, Compare};
        EXPECT_EQ(0, SEQ_SetFuncs(list_, 3, &funcs));
        EXPECT_EQ(0, SEQ_SetRefcon(&tokens_, list_));
        empty_ = Q_MemoryLive(nullptr);
    }
    ~Script()
    {
        EXPECT_EQ(0, SEQ_SetNumItems(0, list_, 0));
        EXPECT_EQ(0, tokens_.Alive());
    }
    int Failures() const { return failures_; }

    void Step()
    {
        int const count = static_cast<int>(model_.size()), index = dice_.Below(count + 4) - 2;
        bool const inList = index >= 0 && index < count, insertable = index >= -1 && index <= count;
        int value = 1 + dice_.Below(size_ < 4 ? 250 : 100000);
        int const number = owns_ ? tokens_.Make(value) : value;
        std::string const outside = Item(size_, number, value);
        void const* source = outside.data();
        if (count > 0 && dice_.Below(3) == 0) {  // an item of the list itself
            int const from = dice_.Below(count);
            source = list_.At(from);
            value = model_[static_cast<std::size_t>(from)];
        }
        wanted_ = model_;
        bool took = false, mayMove = true;
        long long const room = Room();
        void const* const first = count > 0 ? list_.At(0) : nullptr;
        int const kind = dice_.Below(11);
        switch (kind) {
        case 0:
        case 1:
        case 2: {
            took = kind == 2;
            if (took && owns_ && source != outside.data()) {  // what is taken over can't be owned twice
                source = outside.data();
                value = tokens_.ValueIn(source);
            }
            Arm();
            Expect(insertable, took ? SEQ_Insert(source, index, list_) : SEQ_InsertCopy(source, index, list_, 0));
            if (insertable) wanted_.insert(index == -1 ? wanted_.end() : wanted_.begin() + index, value);
            mayMove = count >= room;
            if (source == outside.data() && took && !mayMove) EXPECT_NE(4, code_) << "there was room";
            if (code_ == 0 && mayMove) EXPECT_GE(Room(), room + room / 4) << "appending moves the items rarely";
            took = took && code_ == 0;
            break;
        }
        case 3:
            mayMove = false;
            Arm();
            Expect(inList, SEQ_SetItemCopy(source, index, list_, 0, 0));
            if (inList) wanted_[static_cast<std::size_t>(index)] = value;
            break;
        case 4:
            mayMove = false;
            Arm();
            Expect(inList, SEQ_Remove(index, list_, 0, nullptr));
            if (inList) wanted_.erase(wanted_.begin() + index);
            break;
        case 5: {
            std::string moved(size_, '\0');
            auto const alive = tokens_.Alive();
            Expect(inList, SEQ_Remove(index, list_, 0, moved.data()));
            if (!inList) break;
            EXPECT_EQ(alive, tokens_.Alive()) << "what moves out isn't disposed";
            EXPECT_EQ(Item(size_, Number(moved), model_[static_cast<std::size_t>(index)]), moved);
            if (owns_) Dispose(&tokens_, list_, moved.data());
            wanted_.erase(wanted_.begin() + index);
            break;
        }
        case 6: {
            int const size = dice_.Below(2) ? count / 2 : count + dice_.Below(6);
            Arm();
            Expect(true, SEQ_SetNumItems(size, list_, 0));
            wanted_.resize(static_cast<std::size_t>(size));
            if (code_ == DisposeFailed) model_.resize(static_cast<std::size_t>((*list_)->count));  // how far it came
            break;
        }
        case 7: {
            int const wanted = dice_.Below(2) ? count + dice_.Below(20) : -1;
            mayMove = wanted > room || (wanted < 0 && pins_ == 0);
            Arm();
            Expect(true, wanted < 0 ? SEQ_Compact(list_) : SEQ_ReserveSpace(wanted, list_));
            if (mayMove && code_ == 0) EXPECT_EQ(wanted < 0 ? count : wanted, Room()) << "exactly what was asked for";
            break;
        }
        case 8: Duplicate(); break;
        case 9: WriteAndRead(); break;
        case 10:
            Expect(true, dice_.Below(2) ? SEQ_Lock(1, list_) : SEQ_LockConst(1, list_));
            for (++pins_; pins_ > dice_.Below(3); --pins_)
                EXPECT_EQ(0, dice_.Below(2) ? SEQ_Unlock(list_) : SEQ_UnlockConst(list_));
            break;
        }
        Q_FailAllocation(0);
        tokens_.failCopyIn = tokens_.failDisposeIn = 0;
        if (owns_ && !took) Dispose(&tokens_, list_, const_cast<char*>(outside.data()));
        if (!mayMove || (kind == 6 && Room() == room)) {
            EXPECT_EQ(room, Room());
            if (!model_.empty() && (*list_)->count > 0) EXPECT_EQ(first, list_.At(0));
        }
        if (code_ == 0) model_ = wanted_;
        failures_ += code_ != 0;
        ASSERT_EQ(model_, list_.Values(owns_ ? &tokens_ : nullptr)) << "code " << code_;
        ASSERT_EQ(owns_ ? std::count_if(model_.begin(), model_.end(), [](int v) { return v != 0; }) : 0,
                  tokens_.Alive());
        Look(index);
    }

private:
    // How many items the list has memory for.
    long long Room() const { return (Q_MemoryLive(nullptr).bytes - empty_.bytes) / (*list_)->stride; }
    static int Number(std::string const& item)
    {
        int number = 0;
        std::memcpy(&number, item.data(), std::min(item.size(), sizeof number));
        return number;
    }
    void Arm()
    {
        tokens_.failCopyIn = dice_.Below(8) == 0 ? 1 + dice_.Below(2) : 0;
        tokens_.failDisposeIn = dice_.Below(8) == 0 ? 1 + dice_.Below(2) : 0;
        Q_FailAllocation(dice_.Below(8) == 0 ? 1 + dice_.Below(2) : 0);
        armed_ = true;
    }
    void Expect(bool allowed, int code)
    {
        code_ = code;
        int const reason = Q_FailAllocationFired() ? 4 : code == CopyFailed || code == DisposeFailed ? code : 0;
        EXPECT_EQ(!allowed ? SEQ_Err_BadIndex : armed_ ? reason : 0, code);
        armed_ = false;
    }
    void Duplicate()
    {
        SEQ_Head** made = nullptr;
        Q_MemoryCount const before = Q_MemoryLive(nullptr);
        int const count = static_cast<int>(model_.size()), bytes = count * (*list_)->stride;
        bool const isOneBlock = bytes <= 16384 && !(owns_ && count > 0);
        std::size_t const tokens = tokens_.values.size();
        Arm();
        tokens_.failDisposeIn = 0;
        EXPECT_EQ(0, SEQ_Lock(1, list_));
        Expect(true, SEQ_Duplicate(list_, 0, &made));
        EXPECT_EQ(0, SEQ_Unlock(list_));
        Q_FailAllocation(0);
        EXPECT_EQ(code_ == 0, made != nullptr);
        if (!made) return;
        EXPECT_EQ(before.blocks + (isOneBlock ? 1 : 2), Q_MemoryLive(nullptr).blocks);
        EXPECT_EQ(model_, list_.Values(owns_ ? &tokens_ : nullptr, made));
        EXPECT_EQ(0, SEQ_GetPinCount(made));
        EXPECT_TRUE((*made)->refcon == &tokens_ && (*made)->sort == Compare && (*made)->dispose == (*list_)->dispose);
        tokens_.failCopyIn = 0;
        if (dice_.Below(2)) {
            if (count > 0) EXPECT_EQ(0, SEQ_SetNumItems(count - 1, made, 0));
            Q_FailAllocation(1);
            if (count > 0) EXPECT_EQ(0, SEQ_Insert(std::string(size_, '\0').data(), 0, made)) << "room is reused";
            EXPECT_EQ(4, SEQ_Insert(std::string(size_, '\0').data(), 0, made));
            EXPECT_EQ(0, SEQ_SetNumItems(count + 30, made, 0) + SEQ_SetNumItems(0, made, 0) + SEQ_Compact(made));
            EXPECT_LE(Q_MemoryLive(nullptr).bytes, before.bytes + (isOneBlock ? bytes : 0) + 200);
        }
        tokens_.failDisposeIn = 2;
        bool const refuses = owns_ && (*made)->count > 1;
        EXPECT_EQ(refuses ? DisposeFailed : 0, SEQ_Dispose(made, 0)) << "the first failure, and the others go";
        EXPECT_EQ(refuses && model_[1] != 0, std::count_if(tokens_.values.begin() + static_cast<long>(tokens),
                                                           tokens_.values.end(), [](int v) { return v >= 0; }));
        tokens_.values.resize(tokens);
    }
    // Only the items go into the chunk, and they come back, or nothing does.
    void WriteAndRead()
    {
        std::string items;
        for (int i = 0; i < (*list_)->count; ++i) items.append(static_cast<char const*>(list_.At(i)), size_);
        CKF_File file;
        ASSERT_EQ(0, file.CreateInMemory() + SEQ_Write(list_, &file) + file.Commit());
        std::string const atom = Atom("seql", Long(static_cast<std::uint32_t>(size_)) +
                                                  Long(static_cast<std::uint32_t>(model_.size())) + items);
        ASSERT_EQ(Form(atom), Bytes(file));
        std::string const bytes = Form(Atom("what", "x") + ::List("kfbs", Atom("odd_", "x") + atom) + atom);
        CKF_File read;
        ASSERT_EQ(0, read.Open(Span(bytes)));
        CKF_ScDescendList const leaf(&read, CKF_Id("kfbs"), nullptr, nullptr);
        SEQ_Head **back = nullptr, **none = nullptr;
        Arm();
        Expect(true, SEQ_Read(&read, &back));
        Q_FailAllocation(0);
        ASSERT_EQ(code_ == 0, back != nullptr);
        if (!back) return;
        EXPECT_TRUE(SEQ_GetItemSize(back) == static_cast<int>(size_) && !(*back)->refcon && !(*back)->dispose);
        EXPECT_EQ(model_, list_.Values(owns_ ? &tokens_ : nullptr, back));
        EXPECT_EQ(0, SEQ_Dispose(back, 0));
        EXPECT_EQ(CKF_Err_NoSuchChunk, SEQ_Read(&read, &none)) << "it stays in its list";
        EXPECT_EQ(nullptr, none);
    }
    // Everything that only looks.
    void Look(int index)
    {
        int const count = static_cast<int>(model_.size()), code = index >= 0 && index < count ? 0 : SEQ_Err_BadIndex;
        void* item = nullptr;
        void const* constItem = nullptr;
        EXPECT_EQ(code, SEQ_GetAddress(list_, index, 1, &item));
        EXPECT_EQ(pins_ + (code == 0), SEQ_GetPinCount(list_)) << "a failure owes no unlock";
        EXPECT_EQ(code == 0 || pins_-- > 0 ? 0 : SEQ_Err_NotPinned, SEQ_Unlock(list_));
        pins_ = std::max(pins_, 0);
        EXPECT_EQ(index == -1 && count > 0 ? 0 : code, SEQ_GetConstAddress(list_, index, &constItem));
        if (code == 0)
            EXPECT_EQ(item, constItem);
        else
            EXPECT_EQ(constItem, constItem ? list_.At(count - 1) : nullptr);
        EXPECT_EQ(0u, reinterpret_cast<std::uintptr_t>(constItem) % 8);
        if (count > 1 && size_ % 8 == 0)
            EXPECT_EQ(size_, static_cast<std::size_t>(static_cast<char const*>(list_.At(1)) -
                                                      static_cast<char const*>(list_.At(0))));
        if (!owns_) {
            std::string copy(size_, '#');
            EXPECT_EQ(code, SEQ_GetItemCopy(list_, 0, index, copy.data()));
            if (code == 0) EXPECT_EQ(model_[static_cast<std::size_t>(index)], Number(copy));
        }
        int const other = dice_.Below(count + 2), stop = dice_.Below(count + 3);
        static std::vector<int> visited;
        visited.clear();
        int last = 77;
        auto const visit = [](SEQ_Head**, long refcon, int at, void*) {
            visited.push_back(at);
            return at == refcon ? 99 : 0;
        };
        int const walked = SEQ_ForRange(list_, index, other, stop, visit, &last);
        std::vector<int> path;
        if (code == 0 && other < count)
            for (int at = index; path.empty() || path.back() != other; at += other < index ? -1 : 1) {
                path.push_back(at);
                if (at == stop) break;
            }
        EXPECT_EQ(path, visited);
        EXPECT_EQ(path.empty() ? 77 : path.back(), last);
        EXPECT_EQ(path.empty() ? SEQ_Err_BadIndex : path.back() == stop ? 99 : 0, walked);
    }

    Tokens tokens_;
    Dice dice_;
    std::size_t size_;
    bool owns_, armed_ = false;
    List list_;
    std::vector<int> model_, wanted_;
    int code_ = 0, failures_ = 0, pins_ = 0;
    Q_MemoryCount empty_;
};

TEST(Sequence, FollowsAVectorThroughSuccessAndFailure)
{
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    // Below, beside and above the alignment and the scratch item; many items of the last don't go in one block.
    for (int const itemSize : {1, 3, 4, 8, 9, 104, 600, 3000})
        for (bool const owns : {false, true}) {
            if (owns && itemSize < 4) continue;
            Script script(itemSize, owns);
            for (int step = 0; step < Rounds(1500) && !testing::Test::HasFailure(); ++step) {
                SCOPED_TRACE(testing::Message() << "items of " << itemSize << ", owning " << owns << ", step " << step);
                script.Step();
            }
            EXPECT_GT(script.Failures(), Rounds(150)) << "the failures that this test is about";
        }
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
}

TEST(Sequence, SearchAgreesWithTheStandardLibraryAtEveryCount)
{
    Dice dice(11);
    for (int count = 0; count < 40; ++count) {
        std::vector<int> items(static_cast<std::size_t>(count));
        for (int& item : items) item = dice.Below(40) * 2;
        std::sort(items.begin(), items.end());
        List const list(count % 2 ? 8 : 12, items);
        unsigned char found = 77;
        int index = 77;
        int const nine = 9;
        EXPECT_EQ(SEQ_Err_NoSortFunc, SEQ_GetSortedItem(list, 0, 0, &nine, &found, 0, &index));
        EXPECT_TRUE(found == 77 && index == 77) << "nothing is answered";
        SEQ_Funcs const sorted{nullptr, nullptr, Compare}, keeps{SEQ_RemoveFunc, SEQ_RemoveFunc, nullptr};
        EXPECT_EQ(0, SEQ_SetFuncs(list, 3, &sorted));
        EXPECT_EQ(0, SEQ_SetFuncs(list, 3, &keeps)) << "null leaves the sort function";
        for (int probe = -1; probe <= 81; ++probe) {
            auto const place = std::lower_bound(items.begin(), items.end(), probe);
            ASSERT_EQ(0, SEQ_GetSortedConstItem(list, 0, 0, &probe, &found, 0, &index));
            ASSERT_EQ(place - items.begin(), index) << count << " items, probe " << probe;
            ASSERT_EQ(place != items.end() && *place == probe, found == 1) << count << " items, probe " << probe;
        }
        SEQ_Funcs const none{nullptr, nullptr, SEQ_RemoveFunc};
        EXPECT_EQ(0, SEQ_SetFuncs(list, 3, &none));
        EXPECT_EQ(SEQ_Err_NoSortFunc, SEQ_GetSortedItem(list, 0, 0, &nine, &found, 0, &index));
    }
}

TEST(Sequence, WalksWhatShrinks)
{
    List const list(8, {1, 2, 3, 4, 5, 6});
    auto const removeEven = [](SEQ_Head** handle, long, int index, void* item) {
        return *static_cast<int*>(item) % 2 == 0 ? SEQ_Remove(index, handle, 0, nullptr) : 0;
    };
    EXPECT_EQ(0, SEQ_ForEach(list, 0, removeEven, 0));
    EXPECT_EQ((std::vector<int>{1, 3, 5}), list.Values());
    auto const stopAt = [](SEQ_Head const* const*, long refcon, int index, void const*) {
        return index >= refcon ? 42 + index : 0;
    };
    EXPECT_EQ(43, SEQ_ForEachConst(list, 1, stopAt, 0)) << "and end where they are told";
    auto const remove = [](SEQ_Head** handle, long, int index, void*) {
        return index < 2 ? SEQ_Remove(0, handle, 0, nullptr) : 0;
    };
    EXPECT_EQ(SEQ_Err_BadIndex, SEQ_ForRange(list, 0, 2, 0, remove, nullptr)) << "what was to come is gone";
}

TEST(Sequence, NonsenseIsRefused)
{
    SEQ_Head **const none = nullptr, **made = nullptr;
    List const list(8, {1});
    SEQ_Funcs const funcs{};
    void* item = nullptr;
    void const* constItem = nullptr;
    int number = 0;
    unsigned char found = 0;
    auto const visit = [](SEQ_Head**, long, int, void*) { return 0; };
    EXPECT_EQ(std::vector<int>(17, SEQ_Err_BadList),
              Codes(SEQ_Dispose(none, 0), SEQ_Duplicate(none, 0, &made), SEQ_SetFuncs(none, 3, &funcs),
                    SEQ_SetRefcon(nullptr, none), SEQ_Lock(1, none), SEQ_Unlock(none),
                    SEQ_GetAddress(none, 0, 1, &item), SEQ_GetConstAddress(none, 0, &constItem),
                    SEQ_GetItemCopy(none, 0, 0, &number), SEQ_SetItemCopy(&number, 0, none, 0, 0),
                    SEQ_InsertCopy(&number, 0, none, 0), SEQ_Remove(0, none, 0, nullptr),
                    SEQ_GetSortedItem(none, 0, 0, &number, &found, 0, &number), SEQ_ForEach(none, 0, visit, 0),
                    SEQ_ReserveSpace(1, none), SEQ_Compact(none), SEQ_SetNumItems(1, none, 0)));
    EXPECT_EQ(std::vector<int>(14, SEQ_Err_BadArgument),
              Codes(SEQ_Duplicate(list, 0, nullptr), SEQ_SetFuncs(list, 2, &funcs), SEQ_SetFuncs(list, 3, nullptr),
                    SEQ_GetAddress(list, 0, 1, nullptr), SEQ_GetConstAddress(list, 0, nullptr),
                    SEQ_GetItemCopy(list, 0, 0, nullptr), SEQ_SetItemCopy(nullptr, 0, list, 0, 0),
                    SEQ_InsertCopy(nullptr, 0, list, 0), SEQ_SetNumItems(-1, list, 0), SEQ_ReserveSpace(-1, list),
                    SEQ_New(0, 0, 4, 1, &made), SEQ_New(0, -1, 4, 1, &made), SEQ_New(0, SHRT_MIN, 4, 1, &made),
                    SEQ_New(0, 8, 4, 1, nullptr)));
    EXPECT_EQ(nullptr, made);
    EXPECT_EQ((std::vector<int>{1}), list.Values());
}

}  // namespace
