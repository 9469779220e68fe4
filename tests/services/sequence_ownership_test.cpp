#include "frame/services/memory.h"
#include "frame/services/sequence.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <random>
#include <utility>
#include <vector>

namespace {

int CompareBytes(void*, SEQ_Head const* const* list, void const* a, void const* b)
{
    return std::memcmp(a, b, static_cast<std::size_t>((*list)->itemSize));
}

// Items that own something: each holds the number of a token, and the tokens alive are counted. Functions fail on
// order.
struct Tokens {
    std::vector<int> values;  // by token; -1 once disposed
    int failCopyIn = 0;       // the n-th copy from now fails
    int failDisposeIn = 0;

    static constexpr int CopyFailed = 501;
    static constexpr int DisposeFailed = 502;

    int Make(int value)
    {
        values.push_back(value);
        return static_cast<int>(values.size()) - 1;
    }
    int Alive() const
    {
        return static_cast<int>(std::count_if(
            values.begin(), values.end(), [](int value) { return value >= 0; }));
    }
    static bool Falls(int& countdown) { return countdown > 0 && --countdown == 0; }

    static int TokenIn(void const* item)
    {
        int token;
        std::memcpy(&token, item, sizeof token);
        return token;
    }
    static int Copy(void* refcon, SEQ_Head const* const* list, void const* source, void* destination)
    {
        Tokens& tokens = *static_cast<Tokens*>(refcon);
        EXPECT_EQ(refcon, (*list)->refcon) << "the callback finds the owner from the list it is given";
        if (Falls(tokens.failCopyIn)) return CopyFailed;
        int const value = tokens.values.at(static_cast<std::size_t>(TokenIn(source)));
        EXPECT_GE(value, 0) << "copied after disposal";
        int const token = tokens.Make(value);
        std::memcpy(destination, &token, sizeof token);
        return 0;
    }
    static int Dispose(void* refcon, SEQ_Head**, void* item)
    {
        Tokens& tokens = *static_cast<Tokens*>(refcon);
        if (Falls(tokens.failDisposeIn)) return DisposeFailed;
        int& value = tokens.values.at(static_cast<std::size_t>(TokenIn(item)));
        EXPECT_GE(value, 0) << "disposed twice";
        value = -1;
        return 0;
    }
};

class TokenList {
public:
    TokenList(short itemSize, Tokens& tokens) : tokens_(tokens), size_(static_cast<std::size_t>(itemSize))
    {
        SEQ_Funcs const funcs{Tokens::Copy, Tokens::Dispose, nullptr};
        EXPECT_EQ(0, SEQ_New(0, itemSize, 4, 1, &list_));
        EXPECT_EQ(0, SEQ_SetFuncs(list_, 3, &funcs));
        EXPECT_EQ(0, SEQ_SetRefcon(&tokens, list_));
    }
    TokenList(TokenList const&) = delete;
    TokenList& operator=(TokenList const&) = delete;
    ~TokenList()
    {
        if (list_) SEQ_Dispose(list_, 0);
    }

    SEQ_Head** get() const { return list_; }
    SEQ_Head** release() { return std::exchange(list_, nullptr); }
    std::vector<int> Values() const { return ValuesOf(list_); }
    std::vector<int> ValuesOf(SEQ_Head** list) const
    {
        std::vector<int> values;
        for (int i = 0; i < (*list)->count; ++i) {
            void const* item = nullptr;
            SEQ_GetConstAddress(list, i, &item);
            values.push_back(tokens_.values.at(static_cast<std::size_t>(Tokens::TokenIn(item))));
        }
        return values;
    }
    std::vector<unsigned char> ItemOf(int token) const
    {
        std::vector<unsigned char> item(size_);
        std::memcpy(item.data(), &token, sizeof token);
        return item;
    }

private:
    Tokens& tokens_;
    std::size_t size_;
    SEQ_Head** list_ = nullptr;
};

// Random edits on a list and on a vector beside it. Some edits are made to fail, by a copy, by a disposal or for want
// of memory, and the list must then be what it was, with nothing leaked and nothing disposed twice.
TEST(SequenceEdits, FollowAVectorThroughSuccessAndFailure)
{
    for (short const itemSize : {4, 9, 104, 600}) {  // below, beside and above the alignment and the scratch item
        SCOPED_TRACE(testing::Message() << "item size " << itemSize);
        Q_MemoryCount const before = Q_MemoryLive(nullptr);
        Tokens tokens;
        {
            TokenList list(itemSize, tokens);
            std::vector<int> model;
            std::mt19937 random(static_cast<unsigned>(itemSize));
            int failures = 0;
            for (int step = 0; step < 3000; ++step) {
                int const value = static_cast<int>(random() % 100000);
                int const count = static_cast<int>(model.size());
                int const index = static_cast<int>(random() % static_cast<unsigned>(count + 1));
                auto const place = model.begin() + index;
                int const source = tokens.Make(value);
                std::vector<unsigned char> const item = list.ItemOf(source);
                bool tookSource = false;
                tokens.failCopyIn = random() % 8 == 0 ? 1 : 0;
                tokens.failDisposeIn = random() % 8 == 0 ? 1 : 0;
                Q_FailAllocation(random() % 8 == 0 ? 1 : 0);

                std::vector<int> wanted = model;
                int code = 0;
                switch (random() % 7) {
                case 0:
                case 1:
                    code = SEQ_InsertCopy(item.data(), index, list.get(), 0);
                    wanted.insert(wanted.begin() + index, value);
                    break;
                case 2:
                    code = SEQ_Insert(item.data(), index, list.get());
                    wanted.insert(wanted.begin() + index, value);
                    tookSource = code == 0;
                    break;
                case 3:
                    if (index == count) break;
                    code = SEQ_SetItemCopy(item.data(), index, list.get(), 0, 0);
                    wanted[static_cast<std::size_t>(index)] = value;
                    break;
                case 4:
                    if (index == count) break;
                    code = SEQ_Remove(index, list.get(), 0, nullptr);
                    wanted.erase(wanted.begin() + index);
                    break;
                case 5: {
                    if (index == count) break;
                    std::vector<unsigned char> moved(static_cast<std::size_t>(itemSize));
                    tokens.failDisposeIn = 0;
                    int const alive = tokens.Alive();
                    code = SEQ_Remove(index, list.get(), 0, moved.data());
                    EXPECT_EQ(alive, tokens.Alive()) << "what moves out isn't disposed";
                    EXPECT_EQ(*place, tokens.values.at(static_cast<std::size_t>(Tokens::TokenIn(moved.data()))));
                    Tokens::Dispose(&tokens, list.get(), moved.data());
                    wanted.erase(wanted.begin() + index);
                    break;
                }
                case 6:
                    tokens.failDisposeIn = 0;
                    if (count > 12) wanted.resize(static_cast<std::size_t>(count / 2));
                    code = count > 12 ? SEQ_SetNumItems(count / 2, list.get(), 0) : SEQ_Compact(list.get());
                    break;
                }
                Q_FailAllocation(0);
                tokens.failCopyIn = tokens.failDisposeIn = 0;
                if (!tookSource) Tokens::Dispose(&tokens, list.get(), list.ItemOf(source).data());
                if (code == 0)
                    model = wanted;
                else
                    ++failures;
                ASSERT_TRUE(code == 0 || code == 4 || code == Tokens::CopyFailed || code == Tokens::DisposeFailed);
                ASSERT_EQ(model, list.Values()) << "step " << step << ", code " << code;
                ASSERT_EQ(static_cast<int>(model.size()), tokens.Alive()) << "step " << step << ", code " << code;
            }
            EXPECT_GT(failures, 300) << "the failures that this test is about";
        }
        EXPECT_EQ(0, tokens.Alive());
        EXPECT_EQ(before, Q_MemoryLive(nullptr));
    }
}

TEST(SequenceDuplicate, HasCopiesOfItsOwnOrLeavesNothingBehind)
{
    Tokens tokens;
    TokenList list(16, tokens);
    for (int value = 0; value < 6; ++value) SEQ_Insert(list.ItemOf(tokens.Make(value)).data(), -1, list.get());
    SEQ_Funcs const sorted{nullptr, nullptr, CompareBytes};
    ASSERT_EQ(0, SEQ_SetFuncs(list.get(), 3, &sorted));
    SEQ_Lock(1, list.get());
    Q_MemoryCount const before = Q_MemoryLive(nullptr);

    for (int copy = 1; copy <= 6; ++copy) {
        tokens.failCopyIn = copy;
        SEQ_Head** none = nullptr;
        EXPECT_EQ(Tokens::CopyFailed, SEQ_Duplicate(list.get(), 0, &none));
        EXPECT_EQ(nullptr, none);
        EXPECT_EQ(6, tokens.Alive()) << "copy " << copy << " failed";
        EXPECT_EQ(before, Q_MemoryLive(nullptr));
    }
    int allocations = 0;
    for (bool fired = true; fired; ++allocations) {
        Q_FailAllocation(allocations + 1);
        SEQ_Head** made = nullptr;
        int const code = SEQ_Duplicate(list.get(), 0, &made);
        fired = Q_FailAllocationFired();
        Q_FailAllocation(0);
        EXPECT_EQ(fired ? 4 : 0, code);
        if (!fired) {
            EXPECT_EQ(list.Values(), list.ValuesOf(made));
            EXPECT_EQ(12, tokens.Alive());
            EXPECT_EQ(&tokens, (*made)->refcon);
            EXPECT_EQ(0, SEQ_GetPinCount(made));
            unsigned char found = 0;
            int index = 0;
            EXPECT_EQ(0, SEQ_GetSortedItem(made, 0, list.ItemOf(0).data(), &found, 0, &index)) << "sort is inherited";
            EXPECT_EQ(0, SEQ_Dispose(made, 0));
        }
        EXPECT_EQ(6, tokens.Alive());
        EXPECT_EQ(before, Q_MemoryLive(nullptr));
    }
    EXPECT_GE(allocations, 3) << "the list and its items were both made to fail";
}

TEST(SequenceDispose, DisposesAllItemsAndAnswersTheFirstFailure)
{
    Tokens tokens;
    TokenList list(4, tokens);
    for (int value = 0; value < 5; ++value) SEQ_Insert(list.ItemOf(tokens.Make(value)).data(), -1, list.get());
    SEQ_Funcs const withoutCopy{SEQ_RemoveFunc, nullptr, nullptr};
    ASSERT_EQ(0, SEQ_SetFuncs(list.get(), 3, &withoutCopy));
    int copy = 77;
    EXPECT_EQ(0, SEQ_GetItemCopy(list.get(), 0, 3, &copy));
    EXPECT_EQ(3, copy) << "without a copy function bytes are copied: the token itself";
    tokens.failDisposeIn = 2;
    EXPECT_EQ(Tokens::DisposeFailed, SEQ_Dispose(list.release(), 0));
    EXPECT_EQ(1, tokens.Alive()) << "only the item that refused is left";
}

}  // namespace
