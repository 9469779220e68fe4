// Random scripts of edits and questions on a leaf and on its twin. After each step everything stored must agree, and
// every answer on the way. A script that fails is cut down and printed as the steps that fail.
// KFS_TEST_SCRIPTS=N runs N scripts a row instead of the usual number, KFS_TEST_SEED=S begins at another seed.

#include "curves/floatkeys.h"
#include "curves/spacetangents.h"
#include "curves/tangents.h"
#include "curves/update.h"
#include "frame/errors.h"
#include "keystore/attributes.h"
#include "keystore/copykeys.h"
#include "keystore/items.h"
#include "keystore/keyflags.h"
#include "keystore/lookup.h"
#include "tests/curves/leafmodel.h"
#include "tests/support/listening.h"
#include "tests/support/streams.h"

#include <cmath>
#include <cstdlib>
#include <random>
#include <sstream>

namespace {

using leafmodel::Done;
using leafmodel::Leaf;
using leafmodel::Numbers;

class LeafScript : public StreamTest {};

// ---- what a script runs on

struct Row {
    char const* why;
    StreamOptions options;
    bool nonDecreasing = false;
    int grid = 10;                 // units between most key times
    unsigned int secondScale = 0;  // of the other leaf, if it has another one
    bool plainPath = false;        // not parametrised by arc length
};

StreamOptions Path(short dimension, bool automatic)
{
    unsigned short const spInterpMask = automatic ? KFS_InterpMask_Negative : 0;
    return {.dimension = dimension, .spatial = true, .spInterpMask = spInterpMask};
}

Row const Rows[] = {
    {.why = "one number", .options = {}},
    {.why = "two numbers that don't fall, keys tick by tick",
     .options = {.dimension = 2},
     .nonDecreasing = true,
     .grid = 1},
    {.why = "three numbers between two scales", .options = {.dimension = 3, .timeScale = 24}, .secondScale = 30},
    {.why = "holds only", .options = {.interpMask = KFS_InterpMask_Hold}},
    {.why = "a constant", .options = {.dimension = 2, .noKeys = true}},
    {.why = "shorts", .options = {.dimension = 2, .type = KFS_Type_S16}},
    {.why = "a path with automatic tangents", .options = Path(3, true), .grid = 1000},
    {.why = "a path with tangents of its own", .options = Path(2, false), .grid = 100},
    {.why = "a path tick by tick", .options = Path(2, true), .grid = 1},
    {.why = "a path in fixed numbers",
     .options = {.dimension = 2, .spatial = true, .type = KFS_Type_Fixed},
     .grid = 100},
    {.why = "chords", .options = Path(4, false), .grid = 100},
    {.why = "a path by its parameter", .options = Path(2, true), .grid = 100, .plainPath = true},
    {.why = "a constant place", .options = {.dimension = 2, .noKeys = true, .spatial = true}},
};

// An operation on one of the two leaves, and the numbers that its arguments are made of.
struct Step {
    int op, leaf, a, b, c, d;
};

bool Near(double a, double b)
{
    return a == b || std::fabs(a - b) <= 1e-8 * (1.0 + std::fabs(a) + std::fabs(b)) || (std::isnan(a) && std::isnan(b));
}

// ---- a leaf and its twin, side by side

struct Pair {
    Pair(Row const& row, char const* called, unsigned int scale)
        : name(called),
          stream([&] {
              StreamOptions options = row.options;
              options.timeScale = scale;
              return options;
          }()),
          leaf({.dimension = row.options.dimension,
                .scale = scale,
                .constant = row.options.noKeys,
                .spatial = row.options.spatial,
                .nonDecreasing = row.options.spatial || row.nonDecreasing,
                .sParametrize = row.options.spatial && row.options.dimension <= 3 && !row.plainPath,
                .spInterp = row.options.spatial && row.options.spInterpMask != 0 ? KFS_SpInterp_Auto : 0,
                .interpMask = row.options.interpMask})
    {
        if (row.nonDecreasing) *stream->GetKFSFlagsForModify() |= KFS_StreamFlag_NonDecreasing;
        EXPECT_EQ(0, row.plainPath ? KFS_SetStreamSParametrize(stream, 0) : 0);
        root.Store(stream);
    }
    ~Pair() { stream->SetParent(nullptr); }

    std::string name;
    HeardRoot root;
    TestStream stream;
    Leaf leaf;
};

class World {
public:
    World(Row const& row, ReportRecorder& reports)
        : row_(row),
          reports_(reports),
          pairs_{{row, "a", row.options.timeScale},
                 {row, "b", row.secondScale != 0 ? row.secondScale : row.options.timeScale}}
    {
        reports_.Take();
        listener_.Take();
    }

    // What differs after the step, or after all; empty if nothing does.
    std::string Take(Step const& step);
    std::string TakeAll();
    std::string const& Steps() const { return steps_; }

    // What is asked and got; whole numbers and truths count as numbers.
    void Same(std::string const& what, double expected, double actual);
    void Same(std::string const& what, Numbers const& expected, double const* actual);
    void Same(std::string const& what, T_Time const& expected, T_Time const& actual);
    // `actual` is in the stream's own type.
    void SameTyped(std::string const& what, Numbers const& expected, Numbers const& actual)
    {
        if (row_.options.type == KFS_Type_Double) return Same(what, expected, actual.data());
        Same(what, 0, std::memcmp(InOwnType(&expected).data(), actual.data(), expected.size() * sizeof(double)));
    }
    // The library's call against the twin's.
    void Compare(Done const& expected, int code);
    void Ask(Pair& pair, T_Time const& at);

    // A value as the stream's own type, in room that 77.0 fills; nothing of nothing.
    Numbers InOwnType(Numbers const* numbers) const
    {
        if (!numbers) return {};
        Numbers room(numbers->size(), 77.0);
        EXPECT_EQ(0, KFS_ConvertItemFromFloat(row_.options.dimension, row_.options.type, numbers->data(), room.data()));
        return room;
    }
    Row const& GetRow() const { return row_; }

private:
    static constexpr std::size_t Samples = 72;
    T_Time Sample(Pair const& pair, std::size_t i) const
    {
        return pair.stream.Time((static_cast<int>(i) * 7 - 60) * row_.grid / 10);
    }
    std::vector<Numbers> Render(Pair const& pair);
    void CompareStored(Pair& pair);
    void CompareKey(std::string const& what, leafmodel::Key const& key, KFS_KeyScalar const* record, Pair const& pair);

    Row row_;
    ReportRecorder& reports_;
    Pair pairs_[2];
    ValueListener listener_;
    std::string steps_, fault_;
};

void World::Same(std::string const& what, double expected, double actual)
{
    if (Near(expected, actual)) return;
    std::ostringstream out;
    out.precision(17);
    out << what << ": expected " << expected << ", is " << actual << "\n";
    fault_ += out.str();
}

void World::Same(std::string const& what, Numbers const& expected, double const* actual)
{
    for (std::size_t i = 0; i < expected.size(); ++i)
        Same(what + "[" + std::to_string(i) + "]", expected[i], actual[i]);
}

void World::Same(std::string const& what, T_Time const& expected, T_Time const& actual)
{
    Same(what + ".value", expected.value, actual.value);
    Same(what + ".scale", expected.scale, actual.scale);
}

void World::Compare(Done const& expected, int code)
{
    Same("result", expected.code, code);
    std::vector<Reported> const seen = reports_.Take();
    if (expected.reports != seen)
        fault_ += "reports: expected " + testing::PrintToString(expected.reports) + ", are " +
                  testing::PrintToString(seen) + "\n";
    Same("notifications", expected.told, listener_.Take());
}

void World::CompareKey(std::string const& what, leafmodel::Key const& key, KFS_KeyScalar const* record,
                       Pair const& pair)
{
    Same(what + " in code", key.in, record->inInterp);
    Same(what + " out code", key.out, record->outInterp);
    Same(what + " flags", key.flags, record->flags);
    auto const handles = [&](double const* inSpeed, double const* inInfluence, double const* outSpeed,
                             double const* outInfluence) {
        if (pair.leaf.set.constant) return;
        Same(what + " in speed", key.inSpeed, inSpeed);
        Same(what + " in influence", key.inInfluence, inInfluence);
        Same(what + " out speed", key.outSpeed, outSpeed);
        Same(what + " out influence", key.outInfluence, outInfluence);
    };
    Same(what + " value", key.value, KFSp_Numbers(record));
    if (pair.leaf.set.spatial) {
        Same(what + " spatial flags", key.spFlags, record->spFlags);
        handles(&record->inSpeed, &record->inInfluence, &record->outSpeed, &record->outInfluence);
        KFSp_SpatialRuns<double const> const runs = KFSp_GetSpatialRuns(record, row_.options.dimension);
        if (pair.leaf.set.constant) return;
        Same(what + " in tangent", key.inTangent, runs.inTangent);
        Same(what + " out tangent", key.outTangent, runs.outTangent);
    } else {
        KFSp_TemporalRuns<double const> const runs = KFSp_GetTemporalRuns(record, row_.options.dimension);
        handles(runs.inSpeed, runs.inInfluence, runs.outSpeed, runs.outInfluence);
    }
}

void World::CompareStored(Pair& pair)
{
    Leaf const& leaf = pair.leaf;
    Same(pair.name + " constant", leaf.set.constant, pair.stream->HasNoKeys());
    if (leaf.set.constant) {
        Same(pair.name + " has a value", leaf.single.has_value(), !pair.stream.CacheIsEmpty());
        if (leaf.single && !pair.stream.CacheIsEmpty()) {
            Same(pair.name + " time", leaf.single->time, pair.stream->GetCache()->time);
            CompareKey(pair.name, *leaf.single, pair.stream->GetCache(), pair);
        }
        return;
    }
    Same(pair.name + " keys", leaf.Count(), pair.stream.Count());
    if (leaf.Count() != pair.stream.Count()) return;
    for (int i = 0; i < leaf.Count(); ++i) {
        std::string const what = pair.name + " key " + std::to_string(i);
        leafmodel::Key const& key = leaf.keys[static_cast<std::size_t>(i)];
        Same(what + " time", key.time, pair.stream.Record(i)->time);
        CompareKey(what, key, pair.stream.Record(i), pair);
        if (leaf.set.spatial && i < leaf.Count() - 1 && !leaf.arcStale.Holds(i))
            Same(what + " arc", key.arc, pair.stream.Record(i)->arcLength);
    }
    Same(pair.name + " first stale", leaf.stale.first, pair.stream.Stale()[0]);
    Same(pair.name + " last stale", leaf.stale.last, pair.stream.Stale()[1]);
    Same(pair.name + " first stale arc", leaf.arcStale.first, pair.stream.ArcStale()[0]);
    Same(pair.name + " last stale arc", leaf.arcStale.last, pair.stream.ArcStale()[1]);
    Same(pair.name + " pins", 0, pair.stream.Pins());
}

// Reads in doubles, and then, where nothing has moved, in the stream's own type.
void World::Ask(Pair& pair, T_Time const& at)
{
    auto const size = static_cast<std::size_t>(row_.options.dimension);
    Numbers expected(size, 77.0), actual = expected, typed = expected;
    bool atKey = false;
    unsigned char found = 0;
    Done const done = pair.leaf.GetValue(at.value, expected, atKey);
    Compare(done, KFS_GetValueFPlus(pair.stream, &at, 0, actual.data(), &found, nullptr));
    Same("value", expected, actual.data());
    Same("at a key", atKey, found != 0);
    if (done.code != 0 || row_.plainPath) return;
    Compare(done, KFS_GetValue(pair.stream, &at, 0, typed.data(), nullptr, nullptr));
    SameTyped("value in its own type", actual, typed);
}

// What a render reads, which works the marks down on a copy of its own and leaves the stream alone.
std::vector<Numbers> World::Render(Pair const& pair)
{
    // Without arc parametrisation a read moves float keys on, each time.
    bool const moves = pair.leaf.set.spatial && !pair.leaf.set.sParametrize;
    if (moves || (pair.leaf.set.constant ? !pair.leaf.single : pair.leaf.keys.empty())) return {};
    std::vector<unsigned char> const before = pair.stream.Bytes();
    std::vector<Numbers> values;
    {
        Q_ScSetCurrentRenderContext const current(kfshost::MakeRenderContext(true));
        for (std::size_t i = 0; i < Samples; ++i) values.push_back(pair.stream.At(Sample(pair, i).value));
    }
    Same("untouched by a render", true, before == pair.stream.Bytes());
    return values;
}

std::string World::TakeAll()
{
    for (Pair& pair : pairs_) {
        std::vector<Numbers> const rendered = Render(pair);
        for (std::size_t i = 0; i < Samples && fault_.empty(); ++i) {
            Ask(pair, Sample(pair, i));
            if (i < rendered.size()) Same("rendered value", rendered[i], pair.stream.At(Sample(pair, i).value).data());
            if (!fault_.empty())
                steps_ += "    " + pair.name + " read at " + std::to_string(Sample(pair, i).value) + "\n";
        }
    }
    return std::exchange(fault_, {});
}

// ---- the operations

// A step's numbers as arguments.
struct Turn {
    World& world;
    Step const& n;
    Pair &pair, &other;
    Leaf& leaf = pair.leaf;
    KFS_Stream* s = pair.stream;
    int index = Index(pair);
    T_Time at = pair.stream.Time(TimeOf(n.b));
    Numbers value = Value(n.c), second = Value(n.c / 3 + n.d);
    Numbers const* first = n.a % 3 != 0 ? &value : nullptr;  // one of them, or both
    Numbers const* last = n.a % 3 != 1 ? &second : nullptr;
    char in = Code(n.d), out = Code(n.d / 7);
    bool on = n.d % 2 != 0;
    bool typed = n.c % 3 == 0;  // by the form that takes the stream's own type

    int Index(Pair const& of) const
    {
        int const count = of.leaf.Count();
        if (n.a % 37 == 36) return n.a % 2 ? count : -3;
        return count == 0 ? 0 : n.a % count;
    }
    int TimeOf(int number) const
    {
        return world.GetRow().grid * (number % 31 - 4) + (number % 4 == 3 ? number % 7 : 0);
    }
    Numbers Value(int number) const
    {
        Numbers numbers;
        for (int i = 0; i < world.GetRow().options.dimension; ++i)
            numbers.push_back(number == 0 ? 0.0 : number * (2 * i + 3) % 41 - 20);
        return numbers;
    }
    static char Code(int number)
    {
        return static_cast<char>(number % 29 == 28 ? 4 : (number / 3) % 4 == 0 ? 2 : number % 4);
    }
    // For answers: a number a component, and a number a handle has.
    Numbers Room() const { return Numbers(value.size(), 77.0); }
    Numbers HandleRoom() const { return Numbers(leaf.set.spatial ? 1 : value.size(), 77.0); }
    void Compare(Done const& expected, int code) const { world.Compare(expected, code); }
};

double const* Data(Numbers const* numbers)
{
    return numbers ? numbers->data() : nullptr;
}

// A value in the stream's own type, for the rest of the caller's expression.
void const* Typed(Turn const& t, Numbers const* numbers, Numbers&& room = {})
{
    room = t.world.InOwnType(numbers);
    return Data(numbers ? &room : nullptr);
}

// Numbers of a size that handles have, from those of a value.
Numbers Scaled(Numbers const& value, double factor, double offset, bool positive = false)
{
    Numbers numbers;
    for (double const number : value) numbers.push_back((positive ? std::fabs(number) : number) * factor + offset);
    return numbers;
}

void Insert(Turn& t, Numbers const* value, bool replaces, char in, char out)
{
    auto const replace = static_cast<unsigned char>(replaces);
    t.Compare(t.leaf.InsertKey(t.at.value, replaces, value, in, out),
              t.typed ? KFS_InsertKey(t.s, &t.at, replace, Typed(t, value), in, out)
                      : KFS_InsertKeyF(t.s, &t.at, replace, Data(value), in, out));
}

// Up to four keys: behind all others or anywhere, in order or not, with times that meet.
void InsertMany(Turn& t)
{
    bool const values = t.n.a % 5 != 0 || t.leaf.set.constant, handles = t.n.c % 3 != 0, behind = t.n.b % 2 != 0;
    int const start = behind && t.leaf.Count() > 0 ? t.leaf.keys.back().time + 1 : t.at.value;
    int const step = t.n.d % 3 == 0 ? -t.world.GetRow().grid : t.world.GetRow().grid * (t.n.d % 4);
    std::vector<leafmodel::Key> batch(static_cast<std::size_t>(t.n.a % 5));
    std::vector<int> times;
    std::string ins, outs;
    Numbers all[5];
    for (int i = 0; leafmodel::Key & key : batch) {
        key.time = start + i * step - (i == 3 ? 2 * step + 1 : 0);
        key.in = Turn::Code(t.n.d + i), key.out = Turn::Code(t.n.d / 7 + i / 2);
        key.value = Scaled(t.value, 1.0, i);
        key.inSpeed = Scaled(t.HandleRoom(), 0.01, i), key.outSpeed = Scaled(t.HandleRoom(), -0.5, t.n.c % 9);
        key.inInfluence = Scaled(t.HandleRoom(), 0.001, 0.3 * i), key.outInfluence = Scaled(t.HandleRoom(), 0.005, 0);
        Numbers const* const parts[] = {&key.value, &key.inSpeed, &key.inInfluence, &key.outSpeed, &key.outInfluence};
        for (std::size_t p = 0; p < 5; ++p) all[p].insert(all[p].end(), parts[p]->begin(), parts[p]->end());
        times.push_back(key.time), ins.push_back(static_cast<char>(key.in)), outs.push_back(static_cast<char>(key.out));
        ++i;
    }
    KFS_NewKeys keys{static_cast<int>(batch.size()),   times.data(), t.at.scale,
                     values ? all[0].data() : nullptr, ins.data(),   outs.data()};
    if (handles) {
        keys.inSpeeds = all[1].data(), keys.inInfluences = all[2].data();
        keys.outSpeeds = all[3].data(), keys.outInfluences = all[4].data();
    }
    bool const replace = t.n.c % 4 != 0;
    t.Compare(t.leaf.InsertKeys(batch, replace, values, handles), KFS_InsertKeys(t.s, &keys, replace));
}

void Flags(Turn& t, unsigned short mask)
{
    auto const flags = static_cast<unsigned short>(t.n.d % 3 == 0 ? 0 : t.n.d % 3 == 1 ? mask : t.n.c);
    t.Compare(t.leaf.SetKeyFlags(t.index, mask, flags), KFS_SetKeyFlags(t.s, t.index, mask, flags));
}

// Asks both for handles: `expected` has as many places as there are answers, `actual` room for all components.
template <class Twin, class Library>
void AskHandles(Turn& t, Numbers const& blank, Twin&& twin, Library&& library)
{
    Numbers const room = t.Room();
    Numbers expected[4] = {blank, blank, blank, blank}, actual[4] = {room, room, room, room};
    t.Compare(twin(expected), library(actual));
    for (std::size_t i = 0; i < 4; ++i) t.world.Same("answer " + std::to_string(i), expected[i], actual[i].data());
}

// Asks both for keys. `ask` gets the places for the answers.
struct Answers {
    int index = 77;
    bool found = false;
    unsigned char foundByte = 0;
    T_Time time{77, 77}, end{77, 77};
};

template <class Twin, class Library>
void AskKeys(Turn& t, Twin&& twin, Library&& library)
{
    Answers expected, actual;
    Done const done = twin(expected);
    t.Compare(done, library(actual));
    t.world.Same("index", expected.index, actual.index);
    t.world.Same("found", expected.found, actual.foundByte != 0);
    t.world.Same("time", expected.time, actual.time);
    t.world.Same("end", expected.end, actual.end);
}

struct Op {
    char const* name;
    int plain, path;  // how often it is drawn
    void (*run)(Turn&);
};

// A call of both, and questions to both: the twin's and the library's expression.
#define BOTH(twin, library) [](Turn& t) { t.Compare(twin, library); }
#define ASK_KEYS(twin, library)                                                                                        \
    [](Turn& t) {                                                                                                      \
        AskKeys(                                                                                                       \
            t, [&](Answers& a) { return twin; }, [&](Answers& a) { return library; });                                 \
    }
#define ASK_HANDLES(room, twin, library)                                                                               \
    [](Turn& t) {                                                                                                      \
        AskHandles(                                                                                                    \
            t, room, [&](Numbers* n) { return twin; }, [&](Numbers* n) { return library; });                           \
    }

Op const Ops[] = {
    {"insert", 12, 12, [](Turn& t) { Insert(t, &t.value, t.n.a % 8 != 0, t.in, t.out); }},
    {"insert many", 6, 4, InsertMany},
    {"insert on the curve", 6, 6,
     [](Turn& t) {
         if (!t.leaf.set.constant) Insert(t, nullptr, true, t.n.a % 2 ? '\0' : t.in, t.n.a % 3 ? '\0' : t.out);
     }},
    {"set", 5, 5,
     [](Turn& t) {
         char const in = t.n.b % 2 ? '\0' : t.in, out = t.n.b % 3 ? '\0' : t.out;
         Numbers const* const value = t.n.b % 5 ? &t.value : nullptr;
         t.Compare(t.leaf.SetKey(t.index, value, in, out), t.typed ? KFS_SetKey(t.s, t.index, Typed(t, value), in, out)
                                                                   : KFS_SetKeyF(t.s, t.index, Data(value), in, out));
     }},
    {"remove", 5, 4,
     [](Turn& t) {
         Numbers expected = t.Room(), actual = t.Room();
         bool const wanted = t.n.c % 2 == 0;
         int const index = t.n.c % 4 == 1 && t.leaf.Count() > 0 ? t.leaf.Count() - 1 : t.index;
         Done const done = t.leaf.RemoveKey(index, &expected);
         t.Compare(done, KFS_RemoveKey(t.s, index, wanted ? actual.data() : nullptr));
         if (done.code == 0 && wanted) t.world.SameTyped("removed value", expected, actual);
     }},
    {"copy a key", 3, 3,
     [](Turn& t) {
         Pair& source = t.n.c % 2 ? t.pair : t.other;
         int const from = t.Index(source);
         auto const replace = static_cast<unsigned char>(t.n.c % 5 != 0);
         T_Time const* const at = t.n.c % 3 != 0 ? &t.at : nullptr;
         int expected = 77, actual = 77;
         Done const done = t.leaf.CopyKey(source.leaf, from, replace, at ? &at->value : nullptr, &expected);
         t.Compare(done, KFS_CopyKey(source.stream, from, replace, at, t.s, &actual));
         t.world.Same("new index", expected, actual);
     }},
    {"copy all keys", 1, 1, BOTH(t.leaf.CopyKeys(t.other.leaf), KFS_CopyKeys(t.other.stream, nullptr, t.s))},
    {"retime", 6, 6,
     [](Turn& t) {
         int index = 77, old = 77, actualIndex = 77;
         T_Time actualOld{77, 77};
         Done const done = t.leaf.SetKeyTime(t.index, t.at.value, &index, &old);
         t.Compare(done, KFS_SetKeyTime(t.s, t.index, nullptr, t.at.value, &actualIndex, &actualOld));
         if (!t.leaf.set.constant) t.world.Same("new index", index, actualIndex);
         if (done.code != KFS_Err_NoKeys) t.world.Same("old time", {old, t.leaf.set.scale}, actualOld);
     }},
    {"flags", 6, 6,
     [](Turn& t) {
         constexpr unsigned short masks[] = {KFS_KeyFlag_Continuous, KFS_KeyFlag_Modifiable,
                                             KFS_KeyFlag_Continuous | KFS_KeyFlag_Modifiable, KFS_KeyFlag_Modifiable};
         Flags(t, masks[t.n.b % 4]);
     }},
    {"float", 1, 8, [](Turn& t) { Flags(t, KFS_KeyFlag_Float); }},
    {"tangents", 5, 5,
     [](Turn& t) {
         Numbers const in = Scaled(t.value, 1 / 40.0, -0.25), out = Scaled(t.second, 1 / 40.0, 0.25);
         Numbers const *const inX = t.first ? &in : nullptr, *const outX = t.last ? &out : nullptr;
         double const tall = std::array{0.01, 1.0, 1e4}[static_cast<std::size_t>(t.n.b % 3)];
         t.Compare(t.leaf.SetKeyTangents(t.index, inX, &t.value, outX, &t.second, tall),
                   KFS_SetKeyTangentsF(t.s, t.index, Data(inX), t.value.data(), Data(outX), t.second.data(), tall));
     }},
    {"velocity", 3, 3,
     BOTH(t.leaf.SetKeyVelocity(t.index, t.first, t.last),
          t.typed && !t.leaf.set.spatial ? KFS_SetKeyVelocity(t.s, t.index, Typed(t, t.first), Typed(t, t.last))
                                         : KFS_SetKeyVelocityF(t.s, t.index, Data(t.first), Data(t.last)))},
    {"influence", 3, 3,
     [](Turn& t) {
         Numbers const in = Scaled(t.value, 1 / 16.0, 0.0), out = Scaled(t.second, 1 / 25.0, 0.0, true);
         Numbers const *const inGiven = t.first ? &in : nullptr, *const outGiven = t.last ? &out : nullptr;
         t.Compare(t.leaf.SetKeyInfluence(t.index, inGiven, outGiven),
                   KFS_SetKeyInfluence(t.s, t.index, Data(inGiven), Data(outGiven)));
     }},
    {"space tangents", 1, 5,
     BOTH(t.leaf.SetKeySpaceTangents(t.index, t.first, t.last),
          t.typed ? KFS_SetKeySpaceTangents(t.s, t.index, -1, Typed(t, t.first), Typed(t, t.last))
                  : KFS_SetKeySpaceTangentsF(t.s, t.index, -1, Data(t.first), Data(t.last)))},
    {"spatial flags", 0, 3,
     [](Turn& t) {
         auto const mask = static_cast<unsigned>(t.n.b % 4), values = static_cast<unsigned>(t.n.d % 4);
         t.Compare(t.leaf.SetKeySpFlags(t.index, mask, values), KFS_SetKeySpFlags(t.s, t.index, mask, values));
     }},
    {"automatic path", 0, 4,
     BOTH(t.leaf.SetKeySpModifiable(t.on, t.index), KFS_SetKeySpModifiable(t.s, t.on, t.index))},
    {"continuous path", 0, 2,
     BOTH(t.leaf.SetKeySpContinuous(t.on, t.index), KFS_SetKeySpContinuous(t.s, t.on, t.index))},
    {"rescale", 1, 1,
     [](Turn& t) {
         unsigned int const scale = std::array{24U, 30U, 600U, 1000U}[static_cast<std::size_t>(t.n.a % 4)];
         t.Compare(t.leaf.Rescale(scale), KFS_RescaleStream(t.s, scale));
     }},
    {"make constant", 1, 1,
     [](Turn& t) {
         // The record turns the constant's value: it is read first, and then given its codes.
         if (!t.leaf.set.constant && t.leaf.Count() > 0) t.world.Ask(t.pair, t.at);
         t.Compare(t.leaf.SetConstant(true, true), t.s->SetConstant(1, 1));
         Insert(t, &t.value, true, KFS_Interp_Hold, KFS_Interp_Hold);
     }},
    {"make keyed", 1, 1,
     [](Turn& t) {
         bool const keeps = t.n.a % 4 != 0;
         t.Compare(t.leaf.SetConstant(false, keeps), t.s->SetConstant(0, keeps));
     }},
    {"parametrize", 1, 0, BOTH(t.leaf.SetSParametrize(t.on), KFS_SetStreamSParametrize(t.s, t.on))},
    {"multiplier", 1, 1,
     [](Turn& t) {
         Numbers const factors = Scaled(t.value, 1 / 20.0, 1.0, true);
         t.Compare(t.leaf.SetMultiplier(factors), KFS_SetStreamMultiplier(t.s, factors.data(), nullptr));
     }},
    {"spatial interpolation", 0, 1,
     [](Turn& t) {
         bool const automatic = t.on && t.value.size() <= 3;
         auto const code = static_cast<unsigned short>(automatic ? KFS_SpInterp_Auto : KFS_SpInterp_None);
         t.Compare(t.leaf.SetSpInterp(code), KFS_SetStreamSpInterp(t.s, code));
         // Nothing is marked. An edit would bend the path at the end of its mark and not measure the arc behind.
         t.Compare(t.leaf.ForceUpdate(), KFS_ForceUpdateStream(t.s));
     }},
    {"accuracy", 1, 1,
     [](Turn& t) {
         double const accuracy = std::array{0.01, 0.3, -0.5}[static_cast<std::size_t>(t.n.a % 3)];
         double expected = 77.0, actual = 77.0;
         Done const done = t.leaf.SetAccuracy(accuracy, expected);
         t.Compare(done, KFS_SetStreamAccuracy(t.s, &accuracy, &actual));
         t.world.Same("old accuracy", expected, actual);
         t.Compare(t.leaf.ForceUpdate(), KFS_ForceUpdateStream(t.s));  // arcs that are measured would stay
     }},
    {"prepare", 2, 2,
     [](Turn& t) {
         t.Compare(t.leaf.PrepareSetValue(t.at.value), KFSp_Boundary([&] { t.s->PrepareSetValue(t.at); }));
     }},
    {"dispose arcs", 0, 1, BOTH(t.leaf.DisposeRemapTables(), KFS_DisposeRemapTables(t.s))},
    {"force", 1, 1, BOTH(t.leaf.ForceUpdate(), KFS_ForceUpdateStream(t.s))},
    {"swap", 1, 1,
     [](Turn& t) { t.Compare(t.leaf.Swap(t.other.leaf), KFSp_Boundary([&] { t.s->swap(*t.other.stream); })); }},
    {"swap with a clone", 1, 1,
     [](Turn& t) {
         std::unique_ptr<KFS_Stream> const clone(t.s->CloneLeaf({true, true}));
         t.Compare(t.leaf.SwapWithClone(), KFSp_Boundary([&] { t.s->swap(*clone); }));
     }},
    {"update", 2, 3,
     [](Turn& t) {
         t.leaf.Update();
         t.Compare({}, t.s->UpdateStream());
     }},
    {"read", 6, 6, [](Turn& t) { t.world.Ask(t.pair, t.at); }},
    {"read tangents", 2, 2,
     ASK_HANDLES(t.HandleRoom(), t.leaf.GetKeyTangents(t.index, n[0], n[1], n[2], n[3]),
                 KFS_GetKeyTangentsF(t.s, t.index, n[0].data(), n[1].data(), n[2].data(), n[3].data()))},
    {"read velocity", 2, 2,
     [](Turn& t) {
         bool const ends = t.n.b % 2;
         // What a constant's sides say about speeds of lines isn't told.
         AskHandles(
             t, t.leaf.set.constant ? Numbers() : t.HandleRoom(),
             [&](Numbers* n) { return t.leaf.GetKeyVelocity(t.index, ends, n[0], n[1]); },
             [&](Numbers* n) { return KFS_GetKeyVelocityF(t.s, t.index, ends, n[0].data(), n[1].data()); });
     }},
    {"read influence", 1, 1,
     ASK_HANDLES(t.HandleRoom(), t.leaf.GetKeyInfluence(t.index, n[0], n[1]),
                 KFS_GetKeyInfluence(t.s, t.index, n[0].data(), n[1].data()))},
    {"read space tangents", 1, 2,
     ASK_HANDLES(t.Room(), t.leaf.GetKeySpaceTangents(t.index, n[0], n[1]),
                 KFS_GetKeySpaceTangentsF(t.s, t.index, -1, n[0].data(), n[1].data()))},
    {"clamp", 1, 0,
     [](Turn& t) {
         bool expected = t.on;  // which is only ever set
         auto actual = static_cast<unsigned char>(t.on);
         auto const fill = [&](Numbers* n) {
             n[0] = t.value;
             n[2] = t.second;
             n[1] = n[3] = Numbers(t.value.size(), 0.1 + t.n.b % 10 / 10.0);
         };
         AskHandles(
             t, t.Room(),
             [&](Numbers* n) {
                 fill(n);
                 return t.leaf.GetClamped(t.index, n[0], n[1], n[2], n[3], expected);
             },
             [&](Numbers* n) {
                 fill(n);
                 return KFS_GetClampedVelInflF(t.s, t.index, 0, n[0].data(), n[1].data(), n[2].data(), n[3].data(),
                                               &actual);
             });
         t.world.Same("clamped", expected, actual != 0);
     }},
    {"read a key", 1, 1,
     [](Turn& t) {
         Numbers value = t.Room(), actual = t.Room();
         int in = 77, out = 77;
         char actualIn = 77, actualOut = 77;
         Done const done = t.leaf.GetKey(t.index, value, in, out);
         t.Compare(done, t.typed ? KFS_GetKey(t.s, t.index, actual.data(), &actualIn, &actualOut)
                                 : KFS_GetKeyF(t.s, t.index, actual.data(), &actualIn, &actualOut));
         if (done.code != 0) return;
         t.typed ? t.world.SameTyped("value", value, actual) : t.world.Same("value", value, actual.data());
         t.world.Same("in code", in, actualIn);
         t.world.Same("out code", out, actualOut);
     }},
    {"read flags", 1, 1,
     [](Turn& t) {
         unsigned int expected = 77, expectedPath = 77, path = 77;
         unsigned short flags = 77;
         Done const done = t.leaf.GetFlags(t.index, expected);
         t.Compare(done, KFS_GetKeyFlags(t.s, t.index, &flags));
         t.world.Same("flags", expected, flags);
         if (!t.leaf.set.spatial) return;
         Done const pathDone = t.leaf.GetSpFlags(t.index, expectedPath);
         t.Compare(pathDone, KFS_GetKeySpFlags(t.s, t.index, &path));
         t.world.Same("spatial flags", expectedPath, path);
     }},
    {"find", 2, 2,
     [](Turn& t) {
         bool const backward = t.n.c % 2, exact = t.on;
         auto const way = static_cast<short>((backward ? KFS_Find_Backward : 0) | (exact ? KFS_Find_AtTime : 0));
         AskKeys(
             t, [&](Answers& a) { return t.leaf.FindKeyTime(t.at.value, backward, exact, a.found, a.index, a.time); },
             [&](Answers& a) { return KFS_FindKeyTime(t.s, &t.at, way, &a.foundByte, &a.index, &a.time); });
     }},
    {"nearest", 2, 2,
     ASK_KEYS(t.leaf.FindNearest(t.at.value, a.index, a.time), KFS_FindNearestKeyTime(t.s, &t.at, &a.index, &a.time))},
    {"time to index", 2, 2, ASK_KEYS(t.leaf.TimeToIndex(t.at.value, a.index), KFS_TimeToIndex(t.s, &t.at, &a.index))},
    {"key index", 1, 1,
     ASK_KEYS(t.leaf.GetKeyIndex(t.at.value, a.index, a.found), KFS_GetKeyIndex(t.s, &t.at, &a.index, &a.foundByte))},
    {"index to time", 2, 2, ASK_KEYS(t.leaf.IndexToTime(t.index, a.time), KFS_IndexToTime(t.s, t.index, &a.time))},
    {"predict", 3, 3,
     [](Turn& t) {
         auto const action = static_cast<unsigned short>(t.n.a % 8);
         AskKeys(
             t, [&](Answers& a) { return t.leaf.PredictInvalid(action, t.at.value, a.time.value, a.end.value); },
             [&](Answers& a) {
                 a.time = a.end = t.at;
                 int const code = KFS_PredictInvalid(t.s, action, &t.at, &a.time, &a.end);
                 a.time.scale = a.end.scale = 77;
                 return code;
             });
     }},
    {"walk", 1, 1,
     [](Turn& t) {
         T_Time const until = t.pair.stream.Time(t.TimeOf(t.n.c));
         T_Time const* const from = t.n.d % 3 ? &t.at : nullptr;
         T_Time const* const to = t.n.d % 4 ? &until : nullptr;
         std::vector<int> expected, actual;
         auto const push = [](KFS_Stream*, long times, int, KFS_KeyScalar* key) {
             reinterpret_cast<std::vector<int>*>(times)->push_back(key->time);
             return 0;
         };
         t.Compare(t.leaf.ForRange(from ? &t.at.value : nullptr, to ? &until.value : nullptr, expected),
                   KFS_ForRange(t.s, from, to, reinterpret_cast<long>(&actual), push, nullptr));
         t.world.Same("walked as the twin", true, expected == actual);
     }},
    {"propose", 1, 1,
     [](Turn& t) {
         int in, out;
         unsigned int flags, spFlags;
         t.leaf.Choose(t.at.value, in, out, flags, spFlags);
         char actualIn = 77, actualOut = 77;
         t.Compare({}, KFS_ChooseInterps(t.s, &t.at, &actualIn, &actualOut));
         t.world.Same("in code", in, actualIn);
         t.world.Same("out code", out, actualOut);
     }},
};

#undef BOTH
#undef ASK_KEYS
#undef ASK_HANDLES

std::string World::Take(Step const& step)
{
    Op const& op = Ops[step.op];
    Turn turn{*this, step, pairs_[step.leaf], pairs_[1 - step.leaf]};
    std::ostringstream out;
    out << "    " << turn.pair.name << ' ' << op.name << ": index " << turn.index << ", time " << turn.at.value
        << ", values " << testing::PrintToString(turn.value) << ' ' << testing::PrintToString(turn.second) << ", codes "
        << +turn.in << ' ' << +turn.out << ", numbers " << step.a << ' ' << step.b << ' ' << step.c << ' ' << step.d
        << "\n";
    steps_ += out.str();
    op.run(turn);
    for (Pair& pair : pairs_) CompareStored(pair);
    return std::exchange(fault_, {});
}

// ---- running and cutting down

std::vector<Step> Draw(Row const& row, unsigned int seed, int length)
{
    std::mt19937 random(seed);
    std::vector<int> weights;
    for (Op const& op : Ops) weights.push_back(row.options.spatial ? op.path : op.plain);
    std::discrete_distribution<int> op(weights.begin(), weights.end());
    std::uniform_int_distribution<int> number(0, 999);
    std::vector<Step> script;
    for (int i = 0; i < length; ++i) {
        Step step{i < 8 ? 0 : op(random), number(random) % 5 == 0, 0, 0, 0, 0};  // inserts come first
        for (int* field : {&step.a, &step.b, &step.c, &step.d}) *field = number(random);
        script.push_back(step);
    }
    return script;
}

// What went wrong, and in which steps; both empty if nothing did. `length`: how many steps it took.
struct Outcome {
    std::string fault, steps;
    std::size_t length = 0;
};

Outcome RunScript(Row const& row, std::vector<Step> const& script, ReportRecorder& reports)
{
    World world(row, reports);
    for (std::size_t i = 0; i < script.size(); ++i) {
        std::string const fault = world.Take(script[i]);
        if (!fault.empty()) return {fault, world.Steps(), i + 1};
    }
    std::string const fault = world.TakeAll();
    return {fault, world.Steps(), script.size()};
}

// Takes steps away, then makes their numbers smaller, for as long as the script still fails.
std::vector<Step> Shrink(Row const& row, std::vector<Step> script, ReportRecorder& reports)
{
    auto const fails = [&](std::vector<Step> const& tried) { return !RunScript(row, tried, reports).fault.empty(); };
    script.resize(RunScript(row, script, reports).length);
    for (std::size_t chunk = script.size() / 2; chunk > 0; chunk /= 2) {
        for (std::size_t i = 0; i + chunk <= script.size();) {
            std::vector<Step> tried = script;
            tried.erase(tried.begin() + static_cast<std::ptrdiff_t>(i),
                        tried.begin() + static_cast<std::ptrdiff_t>(i + chunk));
            if (fails(tried))
                script = tried;
            else
                i += chunk;
        }
    }
    for (std::size_t i = 0; i < script.size(); ++i) {
        for (int Step::*const field : {&Step::a, &Step::b, &Step::c, &Step::d, &Step::leaf}) {
            for (int const smaller : {0, 1, 2, 4, script[i].*field / 10}) {
                std::vector<Step> tried = script;
                tried[i].*field = smaller;
                if (smaller < script[i].*field && fails(tried)) script = tried;
            }
        }
    }
    return script;
}

unsigned int FromEnvironment(char const* name, unsigned int otherwise)
{
    char const* const text = std::getenv(name);
    return text ? static_cast<unsigned int>(std::strtoul(text, nullptr, 10)) : otherwise;
}

TEST_F(LeafScript, AgreesWithItsTwin)
{
    unsigned int const scripts = FromEnvironment("KFS_TEST_SCRIPTS", 40), first = FromEnvironment("KFS_TEST_SEED", 1);
    for (Row const& row : Rows) {
        for (unsigned int seed = first; seed < first + scripts; ++seed) {
            std::vector<Step> const script = Draw(row, seed, 60);
            if (RunScript(row, script, reports).fault.empty()) continue;
            Outcome const outcome = RunScript(row, Shrink(row, script, reports), reports);
            ADD_FAILURE() << row.why << ", seed " << seed << ":\n" << outcome.steps << outcome.fault;
            break;
        }
    }
    reports.Take();
}

}  // namespace
