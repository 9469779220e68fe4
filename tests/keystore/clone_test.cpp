#include "keystore/attributes.h"
#include "keystore/cachestate.h"
#include "keystore/lookup.h"
#include "tests/support/listening.h"
#include "tests/support/notifications.h"
#include "tests/support/ownedvalues.h"
#include "tests/support/text.h"

namespace {

class Cloning : public StreamTest {};
class Swapping : public StreamTest {};

// A spatial stream with everything set that a clone takes along.
TestStream DressedStream()
{
    TestStream stream({.dimension = 2, .timeScale = 30, .spatial = true, .spInterpMask = 0xF});
    stream.Key(0, {0.0, 0.0}).Key(60, {3.0, 4.0}, KFS_Interp_Spline).Key(90, {9.0, 1.0});
    stream->SetInterpMask(5);
    stream->SetAccuracy(0.25);
    *stream->GetMultiplierForModify() = {{1.0, 0.5, 1.0, 1.0}};
    stream->SetMatchName(KFS_MatchName("clone source", true));
    stream->SetDisplayName(Text("Source"));
    stream->SetHidden(true);
    stream->GetExprInfoForModify().SetExpression(Text("time * 2"));
    stream->GetExprInfoForModify().SetFlags(0x11);
    stream->GetExprInfoForModify().SetExpressionError(Text("line 3 is wrong"), 3, Text("wrong"));
    return stream;
}

TEST_F(Cloning, TakesKeysAndExpressionAsAskedAndTheRestAlways)
{
    TestStream const source = DressedStream();
    std::vector<double> const middle = source.At(45);
    ASSERT_NE(nullptr, source.Record(0)->remapTable);
    source->SetDisabledUpdateStream(true);
    source->DisableLegalizeValue(true);
    source->SetExpressionErrorsAreQuiet(true);
    for (bool const keys : {false, true}) {
        for (bool const expression : {false, true}) {
            SCOPED_TRACE(testing::Message() << "keys " << keys << ", expression " << expression);
            std::unique_ptr<KFS_Stream> const clone(source->CloneLeaf({keys, expression}));
            auto const settings = [](KFS_Stream const* s) {
                return std::tuple(s->GetKFSFlags(), s->GetSpInterp(), s->GetSpInterpMask(), s->GetInterpMask(),
                                  s->GetTimeScale(), s->GetAccuracy(), s->GetMultiplier(), s->GetValueDesc()->itemSize,
                                  s->GetMatchName(), s->GetDisplayName(), s->IsHidden());
            };
            EXPECT_TRUE(settings(source) == settings(clone.get()));
            EXPECT_TRUE(clone->CanUpdateStream() && clone->CanLegalizeValue() && !clone->ExpressionErrorsAreQuiet())
                << "temporary blocks stay behind";
            ASSERT_EQ(keys, clone->GetKeys() != nullptr);
            if (keys) {
                EXPECT_EQ(3, clone->GetKeyCount());
                EXPECT_EQ(clone.get(), (*clone->GetKeys())->refcon);
                void const* item = nullptr;
                ASSERT_EQ(0, SEQ_GetConstAddress(clone->GetKeys(), 0, &item));
                EXPECT_EQ(nullptr, static_cast<KFS_KeyScalar const*>(item)->remapTable);
            }
            KFS_ExprInfo const& info = clone->GetExprInfo();
            EXPECT_EQ(Text(expression ? "time * 2" : ""), info.GetExpression());
            EXPECT_EQ(expression ? 0x11u : 0u, info.GetFlags());
            EXPECT_EQ(Text(expression ? "line 3 is wrong" : ""), info.GetExpressionError());
            EXPECT_EQ(-1, info.GetExpressionErrorLine());
            EXPECT_EQ(u16str(), info.GetExpressionErrorShort());
        }
    }
    std::unique_ptr<KFS_Stream> const bare(source->CloneLeafNoKeysOrExpr());
    EXPECT_FALSE(bare->HasExpression());
    EXPECT_EQ(nullptr, bare->GetKeys());
    EXPECT_TRUE(bare->HasKeys()) << "a list is made by its first key";
    double const* const held = KFSp_Numbers(bare->GetCache());
    EXPECT_EQ(middle, (std::vector{held[0], held[1]})) << "the cache record comes along";
}

TEST_F(Cloning, ACloneMadeByARenderIsWholeEverywhere)
{
    TestStream const source = DressedStream();
    source->GetExprInfoForModify().clear();
    std::vector<double> const expected = source.At(20);
    std::unique_ptr<KFS_Stream> clone;
    {
        Q_ScSetCurrentRenderContext const current(kfshost::MakeRenderContext(true));
        clone.reset(source->CloneLeaf({true, true}));
    }
    EXPECT_EQ(0, clone->GetArcInvalidKeyIndex()[0]) << "marked in its own key data, not in the render's";
    EXPECT_EQ(2, clone->GetArcInvalidKeyIndex()[1]);
    ASSERT_EQ(0, KFS_RemoveKey(source, 1, nullptr));
    double value[2] = {};
    T_Time const at{20, 30};
    ASSERT_EQ(0, KFS_GetValueFPlus(clone.get(), &at, 0, value, nullptr, nullptr));
    EXPECT_EQ(expected, (std::vector{value[0], value[1]})) << "with keys of its own";
}

TEST_F(Cloning, WithoutMemoryThrows4AndLeaksNothing)
{
    TestStream const source = DressedStream();
    source.At(30);
    int const failures = FailEveryAllocation(
        [] { return std::make_unique<int>(); }, AtBoundary([&](int&) { delete source->Clone(true); }),
        [](int&, int, Q_MemoryCount const& before) { EXPECT_EQ(before, Q_MemoryLive(nullptr)); });
    EXPECT_GE(failures, 3);
    reports.Take();  // std::bad_alloc is reported where it is translated
}

// Lets that many copies through and then fails.
int S_copiesLeft = 0;

int CopySome(KFS_Stream const* stream, long refcon, short kind, void const* source, void* destination)
{
    return --S_copiesLeft < 0 ? 77 : OwnedValues::Copy(stream, refcon, kind, source, destination);
}

TEST_F(Cloning, AFailureAtAnyValueLeavesNothingBehindAndNobodyHearsOfIt)
{
    OwnedValues::Scope const owned;
    HeardRoot root;
    std::unique_ptr<KFS_Stream> const source = OwnedValues::MakeStream(false);
    for (int const time : {0, 100, 200}) OwnedValues::InsertKey(source.get(), time, time);
    OwnedValues::Read(source.get(), 100);  // fills the cache record
    ASSERT_EQ(0, KFS_SetCustomFuncs(source.get(), CopySome, OwnedValues::Dispose));
    root.Store(source.get());
    ASSERT_EQ(KFS_ListenerState_Heard, source->ProbeListenerState()) << "a clone hears with its source's ears";
    NotificationRecorder recorder;
    int const live = OwnedValues::Live();
    for (int copies = 0; copies < 4; ++copies) {
        S_copiesLeft = copies;
        EXPECT_EQ(77, KFSp_Boundary([&] { delete source->Clone(true); }));
        EXPECT_EQ(live, OwnedValues::Live()) << copies << " copies let through";
        EXPECT_EQ(Notifications{}, recorder.Take());
    }
    S_copiesLeft = 4;  // the cache record and three keys
    delete source->Clone(true);
    EXPECT_EQ(live, OwnedValues::Live());
    EXPECT_EQ(Notifications{"destroyed "}, recorder.Take());
}

// ---- swap

// Keys, marks and settings are the twin's matter; here is what a stream has besides.
TEST_F(Swapping, MovesTheContentAndLeavesWhatBelongsToThePlace)
{
    HeardRoot root;
    TestStream const a = DressedStream(), b;
    root.Store(a);
    KFS_MatchName const name = a->GetMatchName();
    unsigned int const flags = a->GetStreamBaseFlags();
    b->SetInterpMask(7);
    a->SetDisabledUpdateStream(true);
    a->DisableLegalizeValue(true);
    a->SetExpressionErrorsAreQuiet(true);
    a->MarkTemporarilyNonCustom(true);
    auto* const client = reinterpret_cast<KFS_ClientRefCon*>(&root);
    a->SetRefCon(client);
    a->swap(*b);
    EXPECT_EQ(name, b->GetMatchName());
    EXPECT_EQ(Text("Source"), b->GetDisplayName());
    EXPECT_EQ(Text("time * 2"), b->GetExprInfo().GetExpression());
    EXPECT_EQ(flags, b->GetStreamBaseFlags());
    EXPECT_EQ(0xF, b->GetSpInterpMask());
    EXPECT_EQ(b.get(), (*b->GetKeys())->refcon) << "a list names its owner";
    EXPECT_EQ(u16str(), a->GetDisplayName());
    EXPECT_FALSE(a->HasExpression());
    EXPECT_EQ(5, a->GetInterpMask());
    EXPECT_EQ(7, b->GetInterpMask());
    EXPECT_EQ((std::pair{false, true}), (std::pair{a->CanUpdateStream(), b->CanUpdateStream()}));
    EXPECT_FALSE(a->CanLegalizeValue());
    EXPECT_TRUE(a->ExpressionErrorsAreQuiet());
    EXPECT_EQ((std::pair{true, false}), (std::pair{a->IsTemporarilyNonCustom(), b->IsTemporarilyNonCustom()}));
    EXPECT_TRUE(a->GetParent() == &root && b->GetParent() == nullptr);
    EXPECT_TRUE(a->GetRefCon() == client && b->GetRefCon() == nullptr);
}

TEST_F(Swapping, TellsOfTheFirstStreamOnly)
{
    HeardRoot root;
    TestStream const a, b;
    root.Store(a);
    root.Store(b);
    NotificationRecorder recorder;
    recorder.Label(a, "first");
    a->swap(*b);
    EXPECT_EQ(Notifications{"value first"}, recorder.Take());
    b->SetElided(true);
    recorder.Take();
    a->swap(*b);
    EXPECT_EQ((Notifications{"value first", "flags first 1 33"}), recorder.Take());
    a->swap(*b);
    EXPECT_EQ((Notifications{"value first", "flags first 33 1"}), recorder.Take());
}

}  // namespace
