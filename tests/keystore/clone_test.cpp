#include "keystore/attributes.h"
#include "keystore/cachestate.h"
#include "keystore/lookup.h"
#include "tests/support/listening.h"
#include "tests/support/ownedvalues.h"
#include "tests/support/streams.h"

#include <random>
#include <string>

namespace {

u16str Text(char const* text)
{
    return Q_MBToUTF16String(text);
}

class Cloning : public StreamTest {};
class Swapping : public StreamTest {};

// A spatial stream with everything set that a clone takes along.
TestStream DressedStream()
{
    TestStream stream({.dimension = 2, .timeScale = 30, .spatial = true, .spInterpMask = 0xF});
    stream.Key(0, {0.0, 0.0}, KFS_Interp_Spline)
        .Key(60, {3.0, 4.0}, KFS_Interp_Spline)
        .Key(90, {9.0, 1.0}, KFS_Interp_Spline);
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
    const TestStream source = DressedStream();
    const std::vector<double> middle = source.At(45);
    source->SetDisabledUpdateStream(true);
    source->DisableLegalizeValue(true);
    source->SetExpressionErrorsAreQuiet(true);
    for (const bool keys : {false, true}) {
        for (const bool expression : {false, true}) {
            SCOPED_TRACE(testing::Message() << "keys " << keys << ", expression " << expression);
            const std::unique_ptr<KFS_Stream> clone(source->CloneLeaf({keys, expression}));
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
            }
            KFS_ExprInfo const& info = clone->GetExprInfo();
            EXPECT_EQ(Text(expression ? "time * 2" : ""), info.GetExpression());
            EXPECT_EQ(expression ? 0x11u : 0u, info.GetFlags());
            EXPECT_EQ(Text(expression ? "line 3 is wrong" : ""), info.GetExpressionError());
            EXPECT_EQ(-1, info.GetExpressionErrorLine());
            EXPECT_EQ(u16str(), info.GetExpressionErrorShort());
        }
    }
    const std::unique_ptr<KFS_Stream> bare(source->CloneLeafNoKeysOrExpr());
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
    for (int i = 0; i < Count; ++i) {
        source.Key(i, {1.0 * i});
    }
    source.At(5);
    const std::unique_ptr<KFS_Stream> clone(source->CloneLeaf({true, false}));
    EXPECT_EQ(0, clone->GetInvalidKeyIndex()[0]);
    EXPECT_EQ(Count - 1, clone->GetInvalidKeyIndex()[1]);
    EXPECT_EQ(0, clone->GetArcInvalidKeyIndex()[0]);
    EXPECT_EQ(Count - 1, clone->GetArcInvalidKeyIndex()[1]);
}

TEST_F(Cloning, ACloneMadeByARenderIsWholeEverywhere)
{
    TestStream source({.dimension = 2, .spatial = true});
    source.Key(0, {0.0, 0.0}, KFS_Interp_Spline).Key(600, {3.0, 4.0}, KFS_Interp_Spline);
    const std::vector<double> expected = source.At(200);
    const boost::shared_ptr<Q_RenderContext> render = kfshost::MakeRenderContext(true);
    std::unique_ptr<KFS_Stream> clone;
    {
        const Q_ScSetCurrentRenderContext current(render);
        clone.reset(source->CloneLeaf({true, true}));
    }
    EXPECT_EQ(0, clone->GetArcInvalidKeyIndex()[0]) << "marked in its own key data, not in the render's";
    EXPECT_EQ(1, clone->GetArcInvalidKeyIndex()[1]);
    double value[2] = {};
    const T_Time at{200, 600};
    ASSERT_EQ(0, KFS_GetValueFPlus(clone.get(), &at, 0, value, nullptr, nullptr));
    EXPECT_EQ(expected, (std::vector{value[0], value[1]}));
}

// Lets that many copies through and then fails.
int S_copiesLeft = 0;

int CopySome(KFS_Stream const* stream, long refcon, short kind, void const* source, void* destination)
{
    return --S_copiesLeft < 0 ? 77 : OwnedValues::Copy(stream, refcon, kind, source, destination);
}

TEST_F(Cloning, AFailureAtAnyValueLeavesNothingBehind)
{
    OwnedValues::Reset();
    {
        const std::unique_ptr<KFS_Stream> source = OwnedValues::MakeStream(false);
        for (const int time : {0, 100, 200}) {
            const T_Time at{time, 600};
            const OwnedValues::Ticket ticket = OwnedValues::Make(time);
            ASSERT_EQ(0, KFS_InsertKey(source.get(), &at, 1, &ticket, KFS_Interp_Hold, KFS_Interp_Hold));
            OwnedValues::Free(ticket);
        }
        OwnedValues::Ticket out{};
        const T_Time at{100, 600};
        ASSERT_EQ(0, KFS_GetValue(source.get(), &at, 0, &out, nullptr, nullptr));  // fills the cache record
        OwnedValues::Free(out);
        ASSERT_EQ(0, KFS_SetCustomFuncs(source.get(), CopySome, OwnedValues::Dispose));
        const int live = OwnedValues::Live();
        for (int copies = 0;; ++copies) {
            S_copiesLeft = copies;
            int const code = KFSp_Boundary([&] { delete source->Clone(true); });
            EXPECT_EQ(live, OwnedValues::Live()) << copies << " copies let through";
            if (code == 0) {
                EXPECT_EQ(4, copies) << "the cache record and three keys";
                break;
            }
            EXPECT_EQ(77, code);
            ASSERT_LT(copies, 10);
        }
    }
    EXPECT_EQ(0, OwnedValues::Live());
}

TEST_F(Cloning, ADamagedStreamIsRefusedUntouched)
{
    const DamagedStream damaged;
    EXPECT_EQ(2, KFSp_Boundary([&] { KFS_Stream(*damaged.get(), KFS_CloneStreamParams{true, true}); }));
    EXPECT_TRUE(damaged.Untouched());
    EXPECT_EQ(std::vector{DamagedReport(5, "duplicate")}, reports.Take());
}

// ---- swap

// Everything of a leaf that swap is to move, read at many times.
struct Content {
    std::vector<unsigned char> bytes;
    std::vector<std::vector<double>> values;
    u16str name, expression;
    unsigned int flags;
    unsigned int timeScale;
    std::array<int, 2> stale, arcStale;

    explicit Content(TestStream const& stream)
        : name(stream->GetDisplayName()),
          expression(stream->GetExprInfo().GetExpression()),
          flags(stream->GetStreamBaseFlags()),
          timeScale(stream->GetTimeScale()),
          stale(stream.Stale()),
          arcStale(stream.ArcStale())
    {
        if (stream->GetKeys()) {
            bytes = stream.Bytes();
        }
        for (int time = -10; time < 700; time += 71) {
            values.push_back(stream.At(time));
        }
    }
    bool operator==(Content const&) const = default;
};

TestStream RandomStream(std::mt19937& random, bool noKeys)
{
    auto const upTo = [&](int n) { return static_cast<int>(random() % static_cast<unsigned>(n)); };
    const bool spatial = !noKeys && upTo(2) == 1;
    TestStream stream(
        {.dimension = static_cast<short>(spatial ? 2 : 1 + upTo(3)), .noKeys = noKeys, .spatial = spatial});
    std::vector<double> value(static_cast<std::size_t>(stream->GetDimension()));
    for (int i = noKeys ? 1 : 1 + upTo(6); i > 0; --i) {
        for (double& number : value) {
            number = upTo(100);
        }
        stream.Key(noKeys ? 0 : upTo(600), value, static_cast<char>(1 + upTo(3)));
    }
    stream->SetDisplayName(Text(std::to_string(upTo(1000)).c_str()));
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
        const TestStream a = RandomStream(random, round % 5 == 0);
        const TestStream b = RandomStream(random, round % 7 == 0);
        // Read once, so that what is derived is there and the marks are gone; then again for the record.
        static_cast<void>(Content(a));
        static_cast<void>(Content(b));
        const Content ofA(a), ofB(b);
        a->swap(*b);
        EXPECT_EQ(ofB, Content(a));
        EXPECT_EQ(ofA, Content(b));
        for (TestStream const* const stream : {&a, &b}) {
            if ((*stream)->GetKeys()) {
                EXPECT_EQ(stream->get(), (*(*stream)->GetKeys())->refcon) << "a list names its owner";
            }
        }
        b->swap(*a);
        EXPECT_EQ(ofA, Content(a));
        EXPECT_EQ(ofB, Content(b));
    }
}

TEST_F(Swapping, MovesStaleMarksUnrepaired)
{
    TestStream a({.dimension = 2, .spatial = true});
    const TestStream b({.dimension = 2, .spatial = true});
    a.Key(0, {0.0, 0.0}).Key(60, {3.0, 4.0}).Key(120, {9.0, 1.0});
    const auto stale = a.Stale(), arcStale = a.ArcStale();
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
    const TestStream a, b;
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

class SwapListener : public ValueListener {
public:
    void StreamValueChanged(KFS_Stream* stream) override { heard_.push_back(Name(stream) + " value"); }
    void StreamFlagsChanged(KFS_StreamBase* stream, unsigned int oldFlags, unsigned int newFlags) override
    {
        heard_.push_back(Name(stream) + " flags " + std::to_string(oldFlags) + " to " + std::to_string(newFlags));
    }
    std::vector<std::string> Heard() { return std::exchange(heard_, {}); }
    KFS_StreamBase const* first = nullptr;

private:
    std::string Name(KFS_StreamBase const* stream) const { return stream == first ? "first" : "second"; }
    std::vector<std::string> heard_;
};

TEST_F(Swapping, TellsOfTheFirstStreamOnly)
{
    HeardRoot root;
    const TestStream a, b;
    root.Store(a);
    root.Store(b);
    SwapListener listener;
    listener.first = a.get();
    a->swap(*b);
    EXPECT_EQ(std::vector<std::string>{"first value"}, listener.Heard());
    b->SetElided(true);
    listener.Heard();
    a->swap(*b);
    EXPECT_EQ((std::vector<std::string>{"first value", "first flags 1 to 33"}), listener.Heard());
    a->swap(*b);
    EXPECT_EQ((std::vector<std::string>{"first value", "first flags 33 to 1"}), listener.Heard());
}

TEST_F(Swapping, WithoutMemoryExchangesNothingOrAll)
{
    struct Pair {
        TestStream a, b;
    };
    const u16str longText = Text(std::string(300, 'x').c_str());
    const auto make = [&] {
        auto pair = std::make_unique<Pair>();
        pair->a.Key(0, {1.0});
        pair->b.Key(0, {2.0});
        pair->a->GetExprInfoForModify().SetExpression(longText);
        pair->b->GetExprInfoForModify().SetExpression(longText + longText);
        return pair;
    };
    const auto check = [&](Pair& pair, int code, Q_MemoryCount) {
        EXPECT_NE(0, code);
        EXPECT_EQ(1.0, KFSp_Numbers(pair.a.Record(0))[0]);
        EXPECT_EQ(longText, pair.a->GetExprInfo().GetExpression());
        EXPECT_EQ(2.0, KFSp_Numbers(pair.b.Record(0))[0]);
        EXPECT_EQ(longText + longText, pair.b->GetExprInfo().GetExpression());
    };
    const int failures = FailEveryAllocation(
        make, [](Pair& pair) { return pair.a->swap(*pair.b), 0; }, check);
    EXPECT_GE(failures, 2);
    reports.Take();  // std::bad_alloc is reported where it is translated
}

}  // namespace
