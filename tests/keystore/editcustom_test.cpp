#include "keystore/edit.h"

#include "curves/segment_private.h"
#include "keystore/keyflags.h"
#include "keystore/lookup.h"
#include "tests/support/ownedvalues.h"
#include "tests/support/streams.h"

#include <functional>

// Edits of keys whose values own something.

namespace {

constexpr char None = KFS_Interp_None;
constexpr char Linear = KFS_Interp_Linear;
constexpr char Spline = KFS_Interp_Spline;
constexpr char Hold = KFS_Interp_Hold;

class EditCustom : public StreamTest {};

TEST_F(EditCustom, ACachedValueThatCantBeGivenBackStopsAnEdit)
{
    OwnedValues::Reset();
    auto stream = OwnedValues::MakeStream(false);
    T_Time const at{10, 600};
    OwnedValues::Ticket const mine = OwnedValues::Make(5.0);
    ASSERT_EQ(0, KFS_InsertKey(stream.get(), &at, 0, &mine, Hold, Hold));
    std::function<int()> const edits[] = {
        [&] { return KFS_RemoveKey(stream.get(), 0, nullptr); },
        [&] { return KFS_SetKey(stream.get(), 0, nullptr, Linear, Linear); },
        [&] { return KFS_SetKeyFlags(stream.get(), 0, KFS_KeyFlag_Modifiable, KFS_KeyFlag_Modifiable); },
    };
    for (auto const& edit : edits) {
        OwnedValues::Ticket out{};
        ASSERT_EQ(0, KFS_GetValue(stream.get(), &at, 0, &out, nullptr, nullptr));
        OwnedValues::Free(out);
        OwnedValues::disposeCode = 9002;
        EXPECT_EQ(9002, edit());
        OwnedValues::disposeCode = 0;
        unsigned short flags = 77;
        char in = 77;
        EXPECT_EQ(0, KFS_GetKeyFlags(stream.get(), 0, &flags));
        EXPECT_EQ(0, KFS_GetKey(stream.get(), 0, nullptr, &in, nullptr));
        EXPECT_EQ(0, flags);
        EXPECT_EQ(Hold, in);
    }
    stream.reset();
    OwnedValues::Free(mine);
}

// The path of custom values is measured in time.
TEST_F(EditCustom, ACustomKeyOnAPathGetsDefaultHandles)
{
    for (bool const given : {false, true}) {
        SCOPED_TRACE(given ? "with a value" : "without a value");
        OwnedValues::Reset();
        {
            auto const stream = OwnedValues::MakeStream(false, true);
            OwnedValues::Ticket const mine = OwnedValues::Make(5.0);
            for (int const time : {0, 600, 300}) {
                T_Time const at{time, 600};
                ASSERT_EQ(0,
                          KFS_InsertKey(stream.get(), &at, 0, given || time != 300 ? &mine : nullptr, Spline, Spline));
            }
            OwnedValues::Free(mine);
            void const* item = nullptr;
            ASSERT_EQ(0, SEQ_GetConstAddress(stream->GetKeys(), 1, &item));
            auto const* const key = static_cast<KFS_KeyScalar const*>(item);
            EXPECT_EQ(1.0, key->inSpeed);
            EXPECT_EQ(1.0, key->outSpeed);
            EXPECT_EQ(KFSp_OneSixth, key->inInfluence);
            EXPECT_EQ(KFSp_OneSixth, key->outInfluence);
            EXPECT_EQ(3, OwnedValues::Live());
        }
        EXPECT_EQ(0, OwnedValues::Live());
    }
}

TEST_F(EditCustom, CustomValuesAreCopiedInAndGivenBack)
{
    for (bool const noKeys : {false, true}) {
        OwnedValues::Reset();
        {
            auto const stream = OwnedValues::MakeStream(noKeys);
            T_Time const at{10, 600};
            OwnedValues::Ticket const mine = OwnedValues::Make(5.0);
            OwnedValues::Ticket const other = OwnedValues::Make(6.0);
            ASSERT_EQ(0, KFS_InsertKey(stream.get(), &at, 0, &mine, Hold, Hold));
            EXPECT_EQ(3, OwnedValues::Live());
            ASSERT_EQ(0, KFS_InsertKey(stream.get(), &at, 1, &other, None, None));
            EXPECT_EQ(3, OwnedValues::Live()) << "the replaced value was given back";
            ASSERT_EQ(0, KFS_SetKey(stream.get(), 0, &mine, None, None));
            EXPECT_EQ(3, OwnedValues::Live());
            ASSERT_EQ(0, KFS_InsertKey(stream.get(), &at, 1, nullptr, None, None));
            EXPECT_EQ(3, OwnedValues::Live());
            T_Time const later{500, 600};
            ASSERT_EQ(0, KFS_InsertKey(stream.get(), &later, 1, nullptr, None, None));
            EXPECT_EQ(noKeys ? 3 : 4, OwnedValues::Live()) << "a key takes the value that is there";
            OwnedValues::Ticket out{};
            ASSERT_EQ(0, KFS_RemoveKey(stream.get(), 0, &out));
            EXPECT_EQ(5.0, OwnedValues::Value(out));
            OwnedValues::Free(out);
            OwnedValues::Free(mine);
            OwnedValues::Free(other);
        }
        EXPECT_EQ(0, OwnedValues::Live());
    }
}

TEST_F(EditCustom, AFailingItemFunctionLeavesTheKeyAsItWas)
{
    struct Row {
        char const* why;
        int copyCode, disposeCode, code;
    };
    for (Row const& row : {Row{"copy", 9001, 0, 9001}, Row{"dispose", 0, 9002, 9002}}) {
        for (bool const noKeys : {false, true}) {
            SCOPED_TRACE(testing::Message() << row.why << (noKeys ? ", constant" : ", keys"));
            OwnedValues::Reset();
            auto stream = OwnedValues::MakeStream(noKeys);
            T_Time const at{10, 600};
            T_Time const later{20, 600};
            OwnedValues::Ticket const mine = OwnedValues::Make(5.0);
            ASSERT_EQ(0, KFS_InsertKey(stream.get(), &at, 0, &mine, Hold, Hold));
            OwnedValues::copyCode = row.copyCode;
            OwnedValues::disposeCode = row.disposeCode;
            EXPECT_EQ(row.code, KFS_SetKey(stream.get(), 0, &mine, None, None));
            if (row.copyCode != 0) {
                EXPECT_EQ(row.code, KFS_InsertKey(stream.get(), &later, 1, &mine, Hold, Hold));
            }
            OwnedValues::copyCode = 0;
            OwnedValues::disposeCode = 0;
            EXPECT_EQ(noKeys ? 0 : 1, noKeys ? 0 : (*stream->GetKeys())->count);
            OwnedValues::Ticket out{};
            ASSERT_EQ(0, KFS_RemoveKey(stream.get(), 0, &out));
            EXPECT_EQ(5.0, OwnedValues::Value(out));
            OwnedValues::Free(out);
            OwnedValues::Free(mine);
            stream.reset();
            EXPECT_EQ(row.disposeCode != 0 ? 1 : 0, OwnedValues::Live()) << "but for what could not be given back";
        }
    }
}

}  // namespace
