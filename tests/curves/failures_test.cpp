// One harness for what goes wrong: each exported function of leaves is a row and is called as a caller calls it, on a
// damaged stream, without a value, at an index that isn't there, with the n-th allocation failing, on the main thread
// and in a render, and with a listener that throws.

#include "curves/autotangents_private.h"
#include "curves/floatkeys.h"
#include "curves/manipulate.h"
#include "curves/spacetangents.h"
#include "curves/spatial.h"
#include "curves/subdivide_private.h"
#include "curves/tangents.h"
#include "curves/update.h"
#include "frame/errors.h"
#include "keystore/attributes.h"
#include "keystore/cachestate.h"
#include "keystore/copykeys.h"
#include "keystore/items.h"
#include "keystore/keyflags.h"
#include "keystore/lookup.h"
#include "tests/support/listening.h"
#include "tests/support/streams.h"

#include <climits>
#include <functional>
#include <optional>
#include <stdexcept>

namespace {

class Failures : public StreamTest {};

char const* const Get = "get a value from";
char const* const Inquire = "inquire about a key value in";
char const* const Alter = "alter a key value in";
char const* const Describe = "set value description";
char const* const InsertInto = "insert a key value into";
char const* const RemoveFrom = "remove a key value from";
char const* const CopyFrom = "copy a key value from";
char const* const CopyTo = "copy a key value to";
char const* const Iterate = "iterate over";
char const* const Merge = "merge";
char const* const Dispose = "dispose";
char const* const SetTangents = "set tangents for a key in";
char const* const SetSpatial = "set spatial interp";

enum Trait : unsigned {
    TakesIndex = 1,  // and refuses one that isn't there with the list's code
    Tells = 2,       // the listeners, once it has changed something
    SpatialOnly = 4,
    KeyedOnly = 8,    // a constant without a value isn't its affair
    ChangesAll = 16,  // the whole stream: a failure leaves more behind than a key as it was
    Hidden = 32,      // and its callers see to the rest: only its refusals count
    Member = 64,      // asks the stream for the way, so a damaged one can't be tried
};

struct Row {
    char const* name;
    std::function<int(KFS_Stream*, int index)> call;
    unsigned traits;
    int damagedOperation;
    char const* damagedAction;
    int noKeysOperation = 0;  // 0: it needs no value
    char const* noKeysAction = "";
};

// What the calls hand over and get. Answers are in `number`, behind the arguments.
double number[16];
T_Time const Time{450, 600};
T_Time at{450, 600};
T_Time time_;
int index_, count;
char code;
unsigned char byte;
unsigned short flags;
unsigned int spFlags;
KFS_Stream* other;

double const* In()
{
    static double const in[] = {-0.25, -0.25, -0.25};
    return in;
}
double const* Out()
{
    static double const out[] = {0.25, 0.5, 0.75};
    return out;
}

// Behind the keys of a stream, among them, and on its curve.
KFS_NewKeys Batch(int which)
{
    static int const times[] = {1600, 1700, 1800, 100, 700, 400};
    static double const values[] = {1, 2, 3, 4, 5, 6};
    static char const codes[] = {1, 2, 1};
    return {
        3,     times + (which == 0 ? 0 : 3), 600, which == 2 ? nullptr : values, codes, codes, values, values, values,
        values};
}

int Never(KFS_Stream*, long, int, KFS_KeyScalar*)
{
    return 0;
}

#define CALL(expression) #expression, [](KFS_Stream * s, int i) { return static_cast<void>(i), (expression); }

std::vector<Row> const& Rows()
{
    static std::vector<Row> const rows = {
        {CALL(KFS_InsertKey(s, &Time, 1, Out(), 0, 0)), Tells, 17, InsertInto},
        {CALL(KFS_InsertKey(s, &Time, 1, nullptr, 2, 2)), Tells, 17, InsertInto},
        {CALL(KFS_InsertKeyF(s, &Time, 1, Out(), 2, 2)), Tells, 94, Alter},
        {CALL(KFS_InsertKeys(s, std::array{Batch(0)}.data(), 1)), Tells, 119, InsertInto},
        {CALL(KFS_InsertKeys(s, std::array{Batch(1)}.data(), 1)), Tells, 119, InsertInto},
        {CALL(KFS_InsertKeys(s, std::array{Batch(2)}.data(), 1)), Tells | KeyedOnly, 119, InsertInto},
        {CALL(KFS_SetKey(s, i, Out(), 2, 2)), TakesIndex | Tells, 27, Alter, 27, Alter},
        {CALL(KFS_SetKeyF(s, i, Out(), 2, 2)), TakesIndex | Tells, 92, Alter, 27, Alter},
        {CALL(KFS_RemoveKey(s, i, number)), TakesIndex | Tells, 18, RemoveFrom, 18, RemoveFrom},
        {CALL(KFS_ChooseInterps(s, &Time, &code, &code)), 0, 44, Inquire},
        {CALL(KFS_CopyKey(s, i, 1, &Time, other, &index_)), TakesIndex, 19, CopyFrom, 19, CopyFrom},
        {CALL(KFS_CopyKey(other, 0, 1, &Time, s, &index_)), Tells, 19, CopyTo},
        {CALL(KFS_CopyKeys(s, nullptr, other)), 0, 21, CopyFrom, 21, CopyFrom},
        {CALL(KFS_CopyKeys(other, nullptr, s)), Tells | KeyedOnly, 21, CopyTo},
        {CALL(KFS_SetKeyFlags(s, i, KFS_KeyFlag_Continuous, KFS_KeyFlag_Continuous)), TakesIndex | Tells, 73, Alter, 72,
         Inquire},
        {CALL(KFS_SetKeyModifiable(s, 1, i)), TakesIndex | Tells, 73, Alter, 72, Inquire},
        {CALL(KFS_SetKeyFloat(s, 1, i)), TakesIndex | Tells, 73, Alter, 72, Inquire},
        {CALL(KFS_SetKeyTime(s, i, &Time, 0, &index_, &time_)), TakesIndex | Tells | ChangesAll, 33, Alter, 33, Alter},
        {CALL(KFS_SetKeyTangentsF(s, i, In(), In(), Out(), Out(), 1.0)), TakesIndex | Tells, 29, Get, 30, Get},
        {CALL(KFS_GetKeyTangentsF(s, i, number, number + 3, number + 6, number + 9)), TakesIndex, 30, Get, 30, Get},
        {CALL(KFS_SetKeyVelocity(s, i, In(), Out())), TakesIndex | Tells, 51, Alter, 51, Inquire},
        {CALL(KFS_SetKeyVelocityF(s, i, In(), Out())), TakesIndex | Tells, 55, Alter, 51, Inquire},
        {CALL(KFS_GetKeyVelocityF(s, i, 0, number, number + 3)), TakesIndex, 52, Get, 52, Get},
        {CALL(KFS_SetKeyInfluence(s, i, Out(), Out())), TakesIndex | Tells, 53, Alter, 53, Inquire},
        {CALL(KFS_GetKeyInfluence(s, i, number, number + 3)), TakesIndex, 54, Get, 54, Get},
        {CALL(KFS_GetClampedVelInflF(s, i, 0, number, number + 3, nullptr, nullptr, &byte)), TakesIndex, 101, Get, 101,
         Get},
        {CALL(KFS_GetZeroVelocityPoints(s, i, 0, &count, &time_, nullptr)), TakesIndex, 103, Alter, 103, Alter},
        {CALL(KFS_SetKeySpaceTangents(s, i, -1, In(), Out())), TakesIndex | Tells | SpatialOnly | KeyedOnly, 31, Alter,
         31, Alter},
        {CALL(KFS_SetKeySpaceTangentsF(s, i, -1, In(), nullptr)), TakesIndex | Tells | SpatialOnly | KeyedOnly, 90,
         Alter, 31, Alter},
        {CALL(KFS_GetKeySpaceTangentsF(s, i, -1, number, number + 3)), TakesIndex | SpatialOnly, 32, Get, 32, Get},
        {CALL(KFS_GetKeySpFlags(s, i, &spFlags)), TakesIndex | SpatialOnly, 75, Inquire, 72, Inquire},
        {CALL(KFS_SetKeySpContinuous(s, 1, i)), TakesIndex | SpatialOnly, 74, Alter, 72, Inquire},
        {CALL(KFS_SetKeySpModifiable(s, 0, i)), TakesIndex | SpatialOnly, 75, Alter, 72, Inquire},
        {CALL(KFS_DirectManipArc(s, &at, s->IsSpatial(), -1, Out())), Tells | ChangesAll, 98, Alter, 98, Alter},
        {CALL(KFS_ConvertStreamDim(2, 0.0, s, other)), 0, 106, CopyFrom},
        {CALL(KFS_ConvertStreamDim(2, 0.0, other, s)), Tells | ChangesAll, 106, CopyTo},
        {CALL(KFS_FindKeyTime(s, &Time, 0, &byte, &index_, &time_)), 0, 22, "get a key value from"},
        {CALL(KFS_FindNearestKeyTime(s, &Time, &index_, &time_)), 0, 23, Inquire},
        {CALL(KFS_TimeToIndex(s, &Time, &index_)), KeyedOnly, 24, Inquire, 24, Inquire},
        {CALL(KFS_IndexToTime(s, i, &time_)), 0, 25, Inquire},
        {CALL(KFS_GetKeyIndex(s, &Time, &index_, &byte)), 0, 26, Inquire, 26, Get},
        {CALL(KFS_GetKeyFlags(s, i, &flags)), TakesIndex, 72, Inquire, 72, Inquire},
        {CALL(KFS_GetKey(s, i, number, &code, &code)), TakesIndex, 28, Get, 28, Get},
        {CALL(KFS_GetKeyF(s, i, number, &code, &code)), TakesIndex, 28, Get, 28, Get},
        {CALL(KFS_ForRange(s, nullptr, nullptr, 0, Never, nullptr)), 0, 34, Iterate, 34, Iterate},
        {CALL(KFS_ForIndexRange(s, 0, 0, 0, Never, nullptr)), 0, 35, Iterate, 35, Iterate},
        {CALL(KFS_GetValue(s, &Time, 0, number, &byte, nullptr)), 0, 113, Get, 36, Get},
        {CALL(KFS_GetValuePlus(s, &Time, 0, number, &byte, nullptr, nullptr, 0)), 0, 113, Get, 36, Get},
        {CALL(KFS_GetValueF(s, &Time, 0, number, &byte, nullptr)), 0, 113, Get, 36, Get},
        {CALL(KFS_GetValueFPlus(s, &Time, 0, number, &byte, nullptr)), 0, 113, Get, 36, Get},
        {CALL(KFS_DisposeValue(s, number)), 0, 105, Dispose},
        {CALL(KFS_ForceUpdateStream(s)), 0, 59, Merge},
        {CALL(KFS_PredictInvalid(s, 1, &Time, &time_, &time_)), 0, 77, "predict spatial change of"},
        {CALL(KFS_DisposeRemapTables(s)), 0, 89, Dispose},
        {CALL(KFS_RescaleStream(s, 300)), ChangesAll, 7, "time stream rescale"},
        {CALL(KFS_MergeStream(s, nullptr, &other)), 0, 8, Merge},
        {CALL(KFS_MergeStream(other, nullptr, &s)), 0, 8, Merge},
        {CALL(KFS_SetValueDescription(s, nullptr, nullptr)), 0, 9, Describe},
        {CALL(s->SetConstant(s->HasKeys(), 1)), Tells | ChangesAll | Member, 10, "alter time-varyingness of"},
        {CALL(KFS_SetStreamIMask(s, 7)), 0, 16, "set imask"},
        {CALL(KFS_SetStreamSpIMask(s, 7)), 0, 47, "set spatial imask"},
        {CALL(KFS_SetStreamSpInterp(s, 3)), 0, 49, SetSpatial},
        {CALL(KFS_SetStreamSParametrize(s, 1)), Tells | SpatialOnly, 50, SetSpatial},
        {CALL(KFS_SetCustomFuncs(s, nullptr, nullptr)), 0, 39, "set custom functions in"},
        {CALL(KFS_GetStreamAccuracy(s, number)), 0, 117, Describe},
        {CALL(KFS_SetStreamAccuracy(s, nullptr, number)), 0, 88, Describe},
        {CALL(KFS_GetStreamMultiplier(s, number)), SpatialOnly, 118, Describe},
        {CALL(KFS_SetStreamMultiplier(s, Out(), number)), Tells | SpatialOnly, 102, Describe},
        {CALL(KFSp_SetDefaultKeyframeTangents(s, 0, 3, nullptr)), Hidden, 86, SetTangents, 86, SetTangents},
        {CALL(KFSp_SubdivideSpline(s, 0, 1, nullptr)), Hidden | KeyedOnly, 87, Inquire, 87,
         "automatically compute a new point by subdivision in a"},
    };
    return rows;
}

#undef CALL

// A stream with something of everything that can be derived, stale and without room for one more key.
struct Fixture {
    explicit Fixture(bool spatial)
        : stream({.dimension = 2, .spatial = spatial, .type = KFS_Type_Float}),
          second({.dimension = 2, .spatial = spatial, .type = KFS_Type_Float})
    {
        for (TestStream* const each : {&stream, &second})
            for (int i = 0; i < 6; ++i) each->Key(i * 300, {i * i * 1.0, i % 3 * 10.0}, KFS_Interp_Spline);
        EXPECT_EQ(0, KFS_SetKeyModifiable(stream, 1, 2));
        EXPECT_EQ(0, stream->UpdateStream());
        EXPECT_EQ(0, SEQ_Compact(stream->GetKeys()));
        root.Store(stream);
        before = stream.Bytes();
        other = second;
    }
    ~Fixture() { stream->SetParent(nullptr); }

    HeardRoot root;
    TestStream stream, second;
    std::vector<unsigned char> before;
    std::optional<Q_ScSetCurrentRenderContext> render;  // in which the call happens
};

TEST_F(Failures, ADamagedStreamIsRefusedUntouched)
{
    DamagedStream const damaged;
    Fixture const good(true);
    for (Row const& row : Rows()) {
        SCOPED_TRACE(row.name);
        if (row.traits & Member) continue;
        index_ = KFS_INVALID_INDEX;
        EXPECT_EQ(KFS_Err_DamagedStream, row.call(damaged.get(), 0));
        EXPECT_EQ(std::vector{DamagedReport(row.damagedOperation, row.damagedAction)}, reports.Take());
        EXPECT_TRUE(damaged.Untouched());
        EXPECT_EQ(KFS_INVALID_INDEX, index_);
    }
    EXPECT_EQ(good.before, good.stream.Bytes());
}

TEST_F(Failures, WithoutAValueThereIsNothingToAskOrChange)
{
    Fixture const good(true);
    for (Row const& row : Rows()) {
        if (row.noKeysOperation == 0) continue;
        for (bool const constant : {false, true}) {
            if (constant && (row.traits & KeyedOnly)) continue;
            SCOPED_TRACE(testing::Message() << row.name << constant);
            TestStream const stream({.dimension = 2, .noKeys = constant, .spatial = (row.traits & SpatialOnly) != 0});
            EXPECT_EQ(KFS_Err_NoKeys, row.call(stream, 0));
            EXPECT_REPORT(reports, row.noKeysOperation, NoKeysText(row.noKeysAction));
            EXPECT_TRUE(stream.CacheIsEmpty());
        }
    }
}

TEST_F(Failures, AnIndexThatIsntThereIsTheListsToRefuse)
{
    Fixture const good(true);
    ValueListener listener;
    for (Row const& row : Rows()) {
        if (!(row.traits & TakesIndex)) continue;
        for (int const index : {6, 99, -2, INT_MIN + 1}) {
            SCOPED_TRACE(testing::Message() << row.name << " at " << index);
            EXPECT_EQ(SEQ_Err_BadIndex, row.call(good.stream, index));
            EXPECT_EQ(0, good.stream.Pins());
            EXPECT_EQ(0, listener.Take());
        }
    }
    EXPECT_EQ(good.before, good.stream.Bytes());
}

// A listener's exception is the result, and what the library has taken for the call is given back.
TEST_F(Failures, AListenersExceptionIsTheResult)
{
    for (Row const& row : Rows()) {
        for (bool const spatial : {false, true}) {
            if (((row.traits & SpatialOnly) && !spatial) || (row.traits & Hidden)) continue;
            SCOPED_TRACE(testing::Message() << row.name << (spatial ? ", spatial" : ""));
            auto const run = [&](std::function<void()> const& reaction) {
                Fixture const good(spatial);
                ValueListener listener([&] {
                    // It finds the stream itself again, and not as the doubles were handed on.
                    EXPECT_EQ(KFS_Type_Float, good.stream->GetValueDesc()->dataType);
                    EXPECT_EQ(nullptr, good.stream->GetCopyItemFunc());
                    reaction();
                });
                int const result = row.call(good.stream, 2);
                EXPECT_EQ(0, good.stream.Pins() + good.second.Pins());
                return std::pair{result, listener.Take()};
            };
            auto const [result, told] = run([] {});
            EXPECT_EQ(0, result);
            if (!(row.traits & Tells)) continue;
            EXPECT_LT(0, told);
            EXPECT_EQ(4711, run([] { throw 4711; }).first);
            EXPECT_EQ(Q_Err_Exception, run([] { throw std::runtime_error("no ears"); }).first);
            EXPECT_LE(1U, reports.Take().size());
            EXPECT_THROW(run([] { throw "something else"; }), char const*);
        }
    }
}

// Calls until nothing fails any more; `check` looks at the fixture outside the render. Answers how many allocations
// failed.
template <class Check>
int FailEach(Row const& row, bool spatial, bool inRender, bool stale, Check&& check)
{
    SCOPED_TRACE(testing::Message() << row.name << (spatial ? ", spatial" : "") << (inRender ? ", in a render" : "")
                                    << (stale ? ", stale" : ""));
    auto const make = [&] {
        auto fixture = std::make_unique<Fixture>(spatial);
        EXPECT_EQ(0, stale ? fixture->stream->SetInvalid(-1, 6) + fixture->stream->SetArcInvalid(-1, 6) : 0);
        if (inRender) fixture->render.emplace(kfshost::MakeRenderContext(true));
        return fixture;
    };
    return FailEveryAllocation(
        make, [&](Fixture& fixture) { return row.call(fixture.stream, 2); },
        [&](Fixture& fixture, int result, Q_MemoryCount const& before) {
            fixture.render.reset();  // with its copies
            EXPECT_TRUE(!inRender || Q_MemoryLive(nullptr).blocks <= before.blocks);
            check(fixture, result);
        });
}

TEST_F(Failures, EveryFailingAllocationIsACodeAndLeavesTheKeys)
{
    int failures = 0;
    for (Row const& row : Rows()) {
        for (bool const spatial : {false, true}) {
            if (((row.traits & SpatialOnly) && !spatial) || (row.traits & Hidden)) continue;
            failures += FailEach(row, spatial, false, false, [&](Fixture const& good, int result) {
                EXPECT_EQ(0, good.stream.Pins() + good.second.Pins());
                // An overwritten path key may have lost its arc table, which the next read makes again.
                if (result == 0 || (row.traits & ChangesAll) || spatial) return;
                EXPECT_EQ(good.before, good.stream.Bytes());
                EXPECT_TRUE(good.stream.CacheIsEmpty());
            });
        }
    }
    EXPECT_LT(30, failures);
}

// A render works on its own copy, whose making may fail too.
TEST_F(Failures, ARenderWithoutMemoryIsToldSoAndTheStreamStays)
{
    int failures = 0;
    for (Row const& row : Rows()) {
        if (row.traits & (ChangesAll | Hidden)) continue;
        for (bool const stale : {false, true}) {
            failures += FailEach(
                row, true, true, stale,
                [&](Fixture const& good, int) {
                    EXPECT_EQ(good.before, good.stream.Bytes());
                    EXPECT_EQ(stale ? (std::array{0, 5}) : TestStream::NotStale, good.stream.Stale());
                    EXPECT_EQ(stale ? (std::array{0, 5}) : TestStream::NotStale, good.stream.ArcStale());
                    EXPECT_EQ(0, good.stream.Pins());
                });
        }
    }
    EXPECT_LT(30, failures);
}

}  // namespace
