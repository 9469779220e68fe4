#include "keystore/attributes.h"
#include "keystore/cachestate.h"
#include "keystore/lookup.h"
#include "tests/support/listening.h"
#include "tests/support/notifications.h"
#include "tests/support/ownedvalues.h"
#include "tests/support/text.h"

#include <random>

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
            EXPECT_EQ(source->GetKFSFlags(), clone->GetKFSFlags());
            EXPECT_EQ(source->GetSpInterp(), clone->GetSpInterp());
            EXPECT_EQ(0xF, clone->GetSpInterpMask());
            EXPECT_EQ(5, clone->GetInterpMask());
            EXPECT_EQ(30u, clone->GetTimeScale());
            EXPECT_EQ(0.25, clone->GetAccuracy());
            EXPECT_EQ((M_Vector4T<double>{{1.0, 0.5, 1.0, 1.0}}), clone->GetMultiplier());
            EXPECT_EQ(source->GetValueDesc()->itemSize, clone->GetValueDesc()->itemSize);
            EXPECT_EQ(source->GetMatchName(), clone->GetMatchName());
            EXPECT_EQ(Text("Source"), clone->GetDisplayName());
            EXPECT_TRUE(clone->IsHidden());
            EXPECT_TRUE(clone->CanUpdateStream()) << "temporary blocks stay behind";
            EXPECT_TRUE(clone->CanLegalizeValue());
            EXPECT_FALSE(clone->ExpressionErrorsAreQuiet());
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
    double held[2] = {};
    std::memcpy(held, KFSp_Numbers(bare->GetCache()), sizeof held);
    EXPECT_EQ(middle, (std::vector{held[0], held[1]})) << "the cache record comes along";
}

// Marks are kept as ints, so a list may be longer than a short can count.
TEST_F(Cloning, MarksAllKeysStaleHoweverManyThereAre)
{
    TestStream source;
    constexpr int Count = 33000;
    for (int i = 0; i < Count; ++i) source.Key(i, {1.0 * i});
    source.At(5);
    std::unique_ptr<KFS_Stream> const clone(source->CloneLeaf({true, false}));
    for (int const* const range : {clone->GetInvalidKeyIndex(), clone->GetArcInvalidKeyIndex()}) {
        EXPECT_EQ(0, range[0]);
        EXPECT_EQ(Count - 1, range[1]);
    }
}

TEST_F(Cloning, ACloneMadeByARenderIsWholeEverywhere)
{
    TestStream source({.dimension = 2, .spatial = true});
    source.Key(0, {0.0, 0.0}, KFS_Interp_Spline).Key(600, {3.0, 4.0}, KFS_Interp_Spline);
    std::vector<double> const expected = source.At(200);
    std::unique_ptr<KFS_Stream> clone;
    {
        Q_ScSetCurrentRenderContext const current(kfshost::MakeRenderContext(true));
        clone.reset(source->CloneLeaf({true, true}));
    }
    EXPECT_EQ(0, clone->GetArcInvalidKeyIndex()[0]) << "marked in its own key data, not in the render's";
    EXPECT_EQ(1, clone->GetArcInvalidKeyIndex()[1]);
    ASSERT_EQ(0, KFS_RemoveKey(source, 1, nullptr));
    double value[2] = {};
    T_Time const at{200, 600};
    ASSERT_EQ(0, KFS_GetValueFPlus(clone.get(), &at, 0, value, nullptr, nullptr));
    EXPECT_EQ(expected, (std::vector{value[0], value[1]})) << "with keys of its own";
}

TEST_F(Cloning, WithoutMemoryThrows4AndLeaksNothing)
{
    TestStream const source = DressedStream();
    source.At(30);
    int const failures =
        FailEveryAllocation([] { return std::make_unique<int>(); }, [&](int&) { return delete source->Clone(true), 0; },
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

// Everything of a leaf that swap is to move, read at many times.
struct Content {
    std::vector<unsigned char> bytes;
    std::vector<std::vector<double>> values;
    KFS_MatchName matchName;
    u16str name, expression;
    unsigned int flags;
    unsigned int timeScale;
    std::array<int, 2> stale, arcStale;

    explicit Content(TestStream const& stream)
        : matchName(stream->GetMatchName()),
          name(stream->GetDisplayName()),
          expression(stream->GetExprInfo().GetExpression()),
          flags(stream->GetStreamBaseFlags()),
          timeScale(stream->GetTimeScale()),
          stale(stream.Stale()),
          arcStale(stream.ArcStale())
    {
        if (stream->GetKeys()) bytes = stream.Bytes();
        for (int time = -10; time < 700; time += 71) values.push_back(stream.At(time));
    }
    bool operator==(Content const&) const = default;
};

TestStream RandomStream(std::mt19937& random, bool noKeys)
{
    auto const upTo = [&](int n) { return static_cast<int>(random() % static_cast<unsigned>(n)); };
    bool const spatial = !noKeys && upTo(2) == 1;
    TestStream stream(
        {.dimension = static_cast<short>(spatial ? 2 : 1 + upTo(3)), .noKeys = noKeys, .spatial = spatial});
    std::vector<double> value(static_cast<std::size_t>(stream->GetDimension()));
    for (int i = noKeys ? 1 : 1 + upTo(6); i > 0; --i) {
        for (double& number : value) number = upTo(100);
        stream.Key(noKeys ? 0 : upTo(600), value, static_cast<char>(1 + upTo(3)));
    }
    stream->SetDisplayName(Text(std::to_string(upTo(1000))));
    stream->SetMatchName(KFS_MatchName(std::to_string(upTo(1000)).c_str(), true));
    stream->SetElided(upTo(2) == 1);
    if (upTo(2)) {
        stream->GetExprInfoForModify().SetExpression(Text("a"));
        stream->GetExprInfoForModify().SetFlags(KFS_ExprFlag_Disabled);
    }
    return stream;
}

TEST_F(Swapping, MovesTheWholeContentAndBackAgain)
{
    std::mt19937 random(20);
    for (int round = 0; round < 60; ++round) {
        SCOPED_TRACE(round);
        TestStream const a = RandomStream(random, round % 5 == 0);
        TestStream const b = RandomStream(random, round % 7 == 0);
        // Read once, so that what is derived is there and the marks are gone; then again for the record.
        static_cast<void>(Content(a));
        static_cast<void>(Content(b));
        Content const ofA(a), ofB(b);
        a->swap(*b);
        EXPECT_EQ(ofB, Content(a));
        EXPECT_EQ(ofA, Content(b));
        for (TestStream const* const stream : {&a, &b}) {
            KFS_Stream* const leaf = *stream;
            EXPECT_TRUE(!leaf->GetKeys() || (*leaf->GetKeys())->refcon == leaf) << "a list names its owner";
        }
        b->swap(*a);
        EXPECT_EQ(ofA, Content(a));
        EXPECT_EQ(ofB, Content(b));
    }
}

TEST_F(Swapping, MovesStaleMarksUnrepaired)
{
    TestStream a({.dimension = 2, .spatial = true});
    TestStream const b({.dimension = 2, .spatial = true});
    a.Key(0, {0.0, 0.0}).Key(60, {3.0, 4.0}).Key(120, {9.0, 1.0});
    auto const stale = a.Stale(), arcStale = a.ArcStale();
    ASSERT_NE(TestStream::NotStale, arcStale);
    a->swap(*b);
    EXPECT_EQ(stale, b.Stale());
    EXPECT_EQ(arcStale, b.ArcStale());
    EXPECT_EQ(TestStream::NotStale, a.Stale());
    EXPECT_EQ(nullptr, a->GetKeys());
    EXPECT_EQ(3, b.Count());
}

TEST_F(Swapping, LeavesWhatBelongsToThePlace)
{
    HeardRoot root;
    TestStream const a, b;
    root.Store(a);
    a->SetInterpMask(1);
    b->SetInterpMask(7);
    a->SetDisabledUpdateStream(true);
    a->DisableLegalizeValue(true);
    a->SetExpressionErrorsAreQuiet(true);
    a->MarkTemporarilyNonCustom(true);
    auto* const client = reinterpret_cast<KFS_ClientRefCon*>(&root);
    a->SetRefCon(client);
    a->swap(*b);
    EXPECT_EQ(1, a->GetInterpMask());
    EXPECT_EQ(7, b->GetInterpMask());
    EXPECT_FALSE(a->CanUpdateStream());
    EXPECT_TRUE(b->CanUpdateStream());
    EXPECT_FALSE(a->CanLegalizeValue());
    EXPECT_TRUE(a->ExpressionErrorsAreQuiet());
    EXPECT_TRUE(a->IsTemporarilyNonCustom());
    EXPECT_FALSE(b->IsTemporarilyNonCustom());
    EXPECT_EQ(&root, a->GetParent());
    EXPECT_EQ(nullptr, b->GetParent());
    EXPECT_EQ(client, a->GetRefCon());
    EXPECT_EQ(nullptr, b->GetRefCon());
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
