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
    auto const stream = OwnedValues::MakeStream(false);
    OwnedValues::InsertKey(stream.get(), 10, 5.0);
    std::function<int()> const edits[] = {
        [&] { return KFS_RemoveKey(stream.get(), 0, nullptr); },
        [&] { return KFS_SetKey(stream.get(), 0, nullptr, Linear, Linear); },
        [&] { return KFS_SetKeyFlags(stream.get(), 0, KFS_KeyFlag_Modifiable, KFS_KeyFlag_Modifiable); },
    };
    for (auto const& edit : edits) {
        OwnedValues::Read(stream.get(), 10);
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
}

// The path of custom values is measured in time.
TEST_F(EditCustom, ACustomKeyOnAPathGetsDefaultHandles)
{
    for (bool const given : {false, true}) {
        SCOPED_TRACE(given ? "with a value" : "without a value");
        OwnedValues::Scope const owned;
        auto const stream = OwnedValues::MakeStream(false, true);
        for (int const time : {0, 600}) OwnedValues::InsertKey(stream.get(), time, 5.0, Spline);
        T_Time const at{300, 600};
        OwnedValues::Ticket const mine = OwnedValues::Make(5.0);
        ASSERT_EQ(0, KFS_InsertKey(stream.get(), &at, 0, given ? &mine : nullptr, Spline, Spline));
        OwnedValues::Free(mine);
        void const* item = nullptr;
        ASSERT_EQ(0, SEQ_GetConstAddress(stream->GetKeys(), 1, &item));
        auto const* const key = static_cast<KFS_KeyScalar const*>(item);
        EXPECT_EQ((std::array{1.0, 1.0, KFSp_OneSixth, KFSp_OneSixth}),
                  (std::array{key->inSpeed, key->outSpeed, key->inInfluence, key->outInfluence}));
        EXPECT_EQ(3, OwnedValues::Live());
    }
}

TEST_F(EditCustom, CustomValuesAreCopiedInAndGivenBack)
{
    for (bool const noKeys : {false, true}) {
        OwnedValues::Scope const owned;
        auto const stream = OwnedValues::MakeStream(noKeys);
        T_Time const at{10, 600}, later{500, 600};
        OwnedValues::Ticket const mine = OwnedValues::Make(5.0), other = OwnedValues::Make(6.0);
        ASSERT_EQ(0, KFS_InsertKey(stream.get(), &at, 0, &mine, Hold, Hold));
        EXPECT_EQ(3, OwnedValues::Live());
        ASSERT_EQ(0, KFS_InsertKey(stream.get(), &at, 1, &other, None, None));
        EXPECT_EQ(3, OwnedValues::Live()) << "the replaced value was given back";
        ASSERT_EQ(0, KFS_SetKey(stream.get(), 0, &mine, None, None));
        ASSERT_EQ(0, KFS_InsertKey(stream.get(), &at, 1, nullptr, None, None));
        EXPECT_EQ(3, OwnedValues::Live());
        ASSERT_EQ(0, KFS_InsertKey(stream.get(), &later, 1, nullptr, None, None));
        EXPECT_EQ(noKeys ? 3 : 4, OwnedValues::Live()) << "a key takes the value that is there";
        EXPECT_EQ(5.0, OwnedValues::RemoveKey(stream.get(), 0));
        OwnedValues::Free(mine);
        OwnedValues::Free(other);
    }
}

TEST_F(EditCustom, AFailingItemFunctionLeavesTheKeyAsItWas)
{
    for (bool const copyFails : {true, false}) {
        for (bool const noKeys : {false, true}) {
            SCOPED_TRACE(testing::Message() << (copyFails ? "copy" : "dispose") << (noKeys ? ", constant" : ", keys"));
            OwnedValues::Reset();
            auto stream = OwnedValues::MakeStream(noKeys);
            T_Time const at{10, 600}, later{20, 600};
            OwnedValues::Ticket const mine = OwnedValues::Make(5.0);
            ASSERT_EQ(0, KFS_InsertKey(stream.get(), &at, 0, &mine, Hold, Hold));
            (copyFails ? OwnedValues::copyCode : OwnedValues::disposeCode) = 9001;
            EXPECT_EQ(9001, KFS_SetKey(stream.get(), 0, &mine, None, None));
            if (copyFails) EXPECT_EQ(9001, KFS_InsertKey(stream.get(), &later, 1, &mine, Hold, Hold));
            OwnedValues::copyCode = OwnedValues::disposeCode = 0;
            EXPECT_EQ(noKeys ? 0 : 1, noKeys ? 0 : (*stream->GetKeys())->count);
            EXPECT_EQ(5.0, OwnedValues::RemoveKey(stream.get(), 0));
            OwnedValues::Free(mine);
            stream.reset();
            EXPECT_EQ(copyFails ? 0 : 1, OwnedValues::Live()) << "but for what could not be given back";
        }
    }
}

TEST_F(EditCustom, ACustomKeyHasFlagsAndKeepsItsValue)
{
    OwnedValues::Scope const owned;
    auto const stream = OwnedValues::MakeStream(false);
    for (int const time : {0, 100}) OwnedValues::InsertKey(stream.get(), time, 5.0, KFS_Interp_Spline);
    OwnedValues::Read(stream.get(), 100);
    ASSERT_EQ(3, OwnedValues::Live()) << "two keys, and the last value that was read";
    constexpr unsigned short flags = KFS_KeyFlag_Continuous | KFS_KeyFlag_Modifiable;
    ASSERT_EQ(0, KFS_SetKeyFlags(stream.get(), 1, flags, flags));
    EXPECT_EQ(2, OwnedValues::Live());
}

}  // namespace
