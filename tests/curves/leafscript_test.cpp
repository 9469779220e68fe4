// Random scripts of edits and questions on a leaf and on its twin. After each step everything stored must agree, and
// every answer on the way. A script that fails is cut down and printed as the calls that fail.
// KFS_TEST_SCRIPTS=N runs N scripts a row instead of the usual number, KFS_TEST_SEED=S begins at another seed.

#include "curves/floatkeys.h"
#include "curves/spacetangents.h"
#include "curves/tangents.h"
#include "curves/update.h"
#include "frame/errors.h"
#include "keystore/attributes.h"
#include "keystore/copykeys.h"
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
    {.why = "a path with automatic tangents", .options = Path(3, true), .grid = 1000},
    {.why = "a path with tangents of its own", .options = Path(2, false), .grid = 100},
    {.why = "a path tick by tick", .options = Path(2, true), .grid = 1},
    {.why = "chords", .options = Path(4, false), .grid = 100},
    {.why = "a path by its parameter", .options = Path(2, true), .grid = 100, .plainPath = true},
    {.why = "a constant place", .options = {.dimension = 2, .noKeys = true, .spatial = true}},
};

enum Op {
    Insert,
    InsertOnCurve,
    Set,
    Remove,
    CopyOne,
    CopyAll,
    Retime,
    Flags,
    Float,
    Tangents,
    Velocity,
    Influence,
    SpaceTangents,
    SpFlags,
    SpModifiable,
    SpContinuous,
    Scale,
    Constant,
    Keyed,
    Parametrize,
    Multiplier,
    SpInterp,
    Prepare,
    Force,
    Update,
    Read,
    ReadTangents,
    ReadVelocity,
    ReadInfluence,
    ReadClamped,
    ReadSpaceTangents,
    ReadKey,
    Find,
    Nearest,
    ToIndex,
    KeyIndex,
    ToTime,
    Walk,
    Predict,
    Propose,
    OpCount
};

struct Step {
    int op, leaf, a, b, c, d;
};

// How often an operation is drawn, on plain leaves and on paths.
struct Weight {
    Op op;
    int plain, path;
};

constexpr Weight Weights[] = {
    {Insert, 12, 12},
    {InsertOnCurve, 6, 6},
    {Set, 5, 5},
    {Remove, 5, 4},
    {CopyOne, 3, 3},
    {CopyAll, 1, 1},
    {Retime, 6, 6},
    {Flags, 6, 6},
    {Float, 1, 8},
    {Tangents, 5, 5},
    {Velocity, 3, 3},
    {Influence, 3, 3},
    {SpaceTangents, 1, 5},
    {SpFlags, 0, 3},
    {SpModifiable, 0, 4},
    {SpContinuous, 0, 2},
    {Scale, 1, 1},
    {Constant, 1, 1},
    {Keyed, 1, 1},
    {Parametrize, 1, 0},
    {Multiplier, 1, 1},
    {SpInterp, 0, 1},
    {Prepare, 2, 2},
    {Force, 1, 1},
    {Update, 2, 3},
    {Read, 6, 6},
    {ReadTangents, 2, 2},
    {ReadVelocity, 2, 2},
    {ReadInfluence, 1, 1},
    {ReadClamped, 1, 0},
    {ReadSpaceTangents, 1, 2},
    {ReadKey, 1, 1},
    {Find, 2, 2},
    {Nearest, 2, 2},
    {ToIndex, 2, 2},
    {KeyIndex, 1, 1},
    {ToTime, 2, 2},
    {Walk, 1, 1},
    {Predict, 3, 3},
    {Propose, 1, 1},
};

std::vector<Step> Draw(Row const& row, unsigned int seed, int length)
{
    std::mt19937 random(seed);
    std::vector<int> weights;
    for (Weight const& weight : Weights) weights.push_back(row.options.spatial ? weight.path : weight.plain);
    std::discrete_distribution<std::size_t> op(weights.begin(), weights.end());
    std::uniform_int_distribution<int> number(0, 999);
    std::vector<Step> script;
    for (int i = 0; i < length; ++i) {
        Step step{i < 8 ? static_cast<int>(Insert) : Weights[op(random)].op, number(random) % 5 == 0, 0, 0, 0, 0};
        for (int* field : {&step.a, &step.b, &step.c, &step.d}) *field = number(random);
        script.push_back(step);
    }
    return script;
}

// ---- saying what is called

std::ostream& Print(std::ostream& out, Numbers const* numbers)
{
    if (!numbers) return out << "nullptr";
    out << "Numbers{";
    for (std::size_t i = 0; i < numbers->size(); ++i) out << (i ? ", " : "") << (*numbers)[i];
    return out << "}.data()";
}
Numbers const* Given(bool given, Numbers const& numbers)
{
    return given ? &numbers : nullptr;
}
std::ostream& Print(std::ostream& out, T_Time const* time)
{
    return time ? out << "&T_Time{" << time->value << ", " << time->scale << "}" : out << "nullptr";
}
template <class Value>
std::ostream& Print(std::ostream& out, Value const& value)
{
    return out << value;
}

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
                .sParametrize = row.options.spatial && row.options.dimension <= 3,
                .spInterp = row.options.spatial && row.options.spInterpMask != 0 ? KFS_SpInterp_Auto : 0,
                .interpMask = row.options.interpMask})
    {
        if (row.nonDecreasing) *stream->GetKFSFlagsForModify() |= KFS_StreamFlag_NonDecreasing;
        if (row.plainPath) {
            EXPECT_EQ(0, KFS_SetStreamSParametrize(stream, 0));
            leaf.set.sParametrize = false;
        }
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

    // What differs after the step; empty if nothing does.
    std::string Take(Step const& step)
    {
        Run(pairs_[static_cast<std::size_t>(step.leaf)], pairs_[static_cast<std::size_t>(1 - step.leaf)], step);
        for (Pair& pair : pairs_) CompareStored(pair);
        return std::exchange(fault_, {});
    }
    std::string TakeAll()
    {
        std::string const calls = calls_;
        for (Pair& pair : pairs_) {
            std::vector<Numbers> const rendered = Render(pair);
            for (std::size_t i = 0; i < Samples && fault_.empty(); ++i) {
                calls_ = calls;
                Ask(pair, Sample(pair, i));
                if (i < rendered.size()) Same("rendered value", rendered[i], pair.stream.At(Sample(pair, i).value));
            }
        }
        return std::exchange(fault_, {});
    }
    std::string const& Calls() const { return calls_; }

private:
    template <class What>
    void Same(std::string const& what, What const& expected, What const& actual)
    {
        if (expected == actual) return;
        std::ostringstream out;
        out << what << ": expected " << expected << ", is " << actual << "\n";
        fault_ += out.str();
    }
    void Same(std::string const& what, double expected, double actual)
    {
        if (Near(expected, actual)) return;
        std::ostringstream out;
        out.precision(17);
        out << what << ": expected " << expected << ", is " << actual << "\n";
        fault_ += out.str();
    }
    void Same(std::string const& what, Numbers const& expected, double const* actual)
    {
        for (std::size_t i = 0; i < expected.size(); ++i)
            Same(what + "[" + std::to_string(i) + "]", expected[i], actual[i]);
    }
    void Same(std::string const& what, Numbers const& expected, Numbers const& actual)
    {
        Same(what, expected, actual.data());
    }
    void Same(std::string const& what, T_Time const& expected, T_Time const& actual)
    {
        Same(what + ".value", expected.value, actual.value);
        Same(what + ".scale", expected.scale, actual.scale);
    }

    template <class... Args>
    void Say(char const* function, Args const&... args)
    {
        std::ostringstream out;
        [[maybe_unused]] bool first = true;
        ((Print(out << (std::exchange(first, false) ? "" : ", "), args)), ...);
        calls_ += std::string("    ") + function + "(" + out.str() + ");\n";
    }
    // The library's call against the twin's.
    void Compare(char const* what, Done const& expected, int code)
    {
        Same(std::string(what) + " result", expected.code, code);
        std::vector<Reported> const seen = reports_.Take();
        std::ostringstream told, heard;
        for (Reported const& report : expected.reports) told << report;
        for (Reported const& report : seen) heard << report;
        Same(std::string(what) + " reports", told.str(), heard.str());
        Same(std::string(what) + " notifications", expected.told, listener_.Take());
    }

    static constexpr std::size_t Samples = 72;
    T_Time Sample(Pair const& pair, std::size_t i) const
    {
        return pair.stream.Time((static_cast<int>(i) * 7 - 60) * row_.grid / 10);
    }
    std::vector<Numbers> Render(Pair const& pair);
    void CompareStored(Pair& pair);
    void CompareKey(std::string const& what, leafmodel::Key const& key, KFS_KeyScalar const* record, Pair const& pair);
    void Run(Pair& pair, Pair& other, Step const& step);
    void RunEdit(Pair& pair, Pair& other, Step const& step);
    void RunQuestion(Pair& pair, Step const& step);
    void Ask(Pair& pair, T_Time const& at);
    void AskHandles(Pair& pair, Step const& step, int index);

    // From a step's numbers to arguments.
    int Index(Pair const& pair, int n) const
    {
        int const count = pair.leaf.Count();
        if (n % 37 == 36) return n % 2 ? count : -3;
        return count == 0 ? 0 : n % count;
    }
    int TimeOf(int n) const { return row_.grid * (n % 31 - 4) + (n % 4 == 3 ? n % 7 : 0); }
    Numbers Value(int n) const
    {
        Numbers value;
        for (int i = 0; i < row_.options.dimension; ++i) value.push_back(n == 0 ? 0.0 : n * (2 * i + 3) % 41 - 20);
        return value;
    }
    char Code(int n) const { return static_cast<char>(n % 29 == 28 ? 4 : (n / 3) % 4 == 0 ? 2 : n % 4); }

    Row row_;
    ReportRecorder& reports_;
    Pair pairs_[2];
    ValueListener listener_;
    std::string calls_, fault_;
};

void World::CompareKey(std::string const& what, leafmodel::Key const& key, KFS_KeyScalar const* record,
                       Pair const& pair)
{
    int const dimension = row_.options.dimension;
    Same(what + " in code", key.in, static_cast<int>(record->inInterp));
    Same(what + " out code", key.out, static_cast<int>(record->outInterp));
    Same(what + " flags", key.flags, static_cast<unsigned int>(record->flags));
    if (pair.leaf.set.spatial) {
        Same(what + " spatial flags", key.spFlags, record->spFlags);
        KFSp_SpatialRuns<double const> const runs = KFSp_GetSpatialRuns(record, dimension);
        Same(what + " value", key.value, runs.value);
        if (pair.leaf.set.constant) return;
        Same(what + " in tangent", key.inTangent, runs.inTangent);
        Same(what + " out tangent", key.outTangent, runs.outTangent);
        Same(what + " in speed", key.inSpeed, &record->inSpeed);
        Same(what + " in influence", key.inInfluence, &record->inInfluence);
        Same(what + " out speed", key.outSpeed, &record->outSpeed);
        Same(what + " out influence", key.outInfluence, &record->outInfluence);
        return;
    }
    KFSp_TemporalRuns<double const> const runs = KFSp_GetTemporalRuns(record, dimension);
    Same(what + " value", key.value, runs.value);
    if (pair.leaf.set.constant) return;
    Same(what + " in speed", key.inSpeed, runs.inSpeed);
    Same(what + " in influence", key.inInfluence, runs.inInfluence);
    Same(what + " out speed", key.outSpeed, runs.outSpeed);
    Same(what + " out influence", key.outInfluence, runs.outInfluence);
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

void World::Ask(Pair& pair, T_Time const& at)
{
    Say("KFS_GetValueFPlus", pair.name, &at, 0, "value", "&atKey", "nullptr", "nullptr");
    Numbers expected(static_cast<std::size_t>(row_.options.dimension), 77.0), actual = expected;
    bool atKey = false;
    unsigned char found = 0;
    Done const done = pair.leaf.GetValue(at.value, expected, atKey);
    Compare("read", done, KFS_GetValueFPlus(pair.stream, &at, 0, actual.data(), &found, nullptr));
    Same("value", expected, actual);
    Same("at a key", atKey, found != 0);
}

void World::Run(Pair& pair, Pair& other, Step const& step)
{
    step.op < Update ? RunEdit(pair, other, step) : RunQuestion(pair, step);
}

void World::RunEdit(Pair& pair, Pair& other, Step const& step)
{
    KFS_Stream* const s = pair.stream;
    Leaf& leaf = pair.leaf;
    int const index = Index(pair, step.a);
    T_Time const at = pair.stream.Time(TimeOf(step.b));
    Numbers const value = Value(step.c), second = Value(step.c / 3 + step.d);
    char const in = Code(step.d), out = Code(step.d / 7);
    bool const first = step.a % 3 != 0, last = step.a % 3 != 1;
    auto const on = static_cast<unsigned char>(step.d % 2);
    switch (step.op) {
    case Insert: {
        auto const replace = static_cast<unsigned char>(step.a % 8 != 0);
        Say("KFS_InsertKeyF", pair.name, &at, +replace, &value, +in, +out);
        Done const done = leaf.InsertKey(at.value, replace, &value, in, out);
        Compare("insert", done, KFS_InsertKeyF(s, &at, replace, value.data(), in, out));
        break;
    }
    case InsertOnCurve: {
        if (leaf.set.constant) break;
        char const i = step.a % 2 ? 0 : in, o = step.a % 3 ? 0 : out;
        Say("KFS_InsertKeyF", pair.name, &at, 1, "nullptr", +i, +o);
        Compare("insert on the curve", leaf.InsertKey(at.value, true, nullptr, i, o),
                KFS_InsertKeyF(s, &at, 1, nullptr, i, o));
        break;
    }
    case Set: {
        char const i = step.b % 2 ? 0 : in, o = step.b % 3 ? 0 : out;
        Numbers const* const given = step.b % 5 ? &value : nullptr;
        Say("KFS_SetKeyF", pair.name, index, given, +i, +o);
        Compare("set", leaf.SetKey(index, given, i, o), KFS_SetKeyF(s, index, given ? given->data() : nullptr, i, o));
        break;
    }
    case Remove: {
        Say("KFS_RemoveKey", pair.name, index, "nullptr");
        Numbers expected(value.size(), 77.0), actual = expected;
        Compare("remove", leaf.RemoveKey(index, &expected), KFS_RemoveKey(s, index, actual.data()));
        Same("removed value", expected, actual);
        break;
    }
    case CopyOne: {
        Pair& source = step.c % 2 ? pair : other;
        int const from = Index(source, step.a);
        bool const given = step.c % 3 != 0;
        auto const replace = static_cast<unsigned char>(step.c % 5 != 0);
        Say("KFS_CopyKey", source.name, from, +replace, given ? &at : nullptr, pair.name, "&newIndex");
        int expected = 77, actual = 77;
        Done const done = leaf.CopyKey(source.leaf, from, replace, given ? &at.value : nullptr, &expected);
        Compare("copy", done, KFS_CopyKey(source.stream, from, replace, given ? &at : nullptr, s, &actual));
        Same("new index", expected, actual);
        break;
    }
    case CopyAll:
        Say("KFS_CopyKeys", other.name, "nullptr", pair.name);
        Compare("copy all", leaf.CopyKeys(other.leaf), KFS_CopyKeys(other.stream, nullptr, s));
        break;
    case Retime: {
        Say("KFS_SetKeyTime", pair.name, index, "nullptr", at.value, "&newIndex", "&oldTime");
        int newIndex = 77, oldTime = 77, actualIndex = 77;
        T_Time actualTime{};
        Done const done = leaf.SetKeyTime(index, at.value, &newIndex, &oldTime);
        Compare("retime", done, KFS_SetKeyTime(s, index, nullptr, at.value, &actualIndex, &actualTime));
        if (!leaf.set.constant) Same("new index", newIndex, actualIndex);
        if (!leaf.set.constant || leaf.single)
            Same("old time", oldTime, done.code == KFS_Err_NoKeys ? 77 : actualTime.value);
        break;
    }
    case Flags:
    case Float: {
        constexpr unsigned short masks[] = {KFS_KeyFlag_Continuous, KFS_KeyFlag_Modifiable,
                                            KFS_KeyFlag_Continuous | KFS_KeyFlag_Modifiable, KFS_KeyFlag_Modifiable};
        unsigned short const mask = step.op == Float ? (unsigned short)KFS_KeyFlag_Float : masks[step.b % 4];
        auto const flags = static_cast<unsigned short>(step.d % 3 == 0 ? 0 : step.d % 3 == 1 ? mask : step.c);
        Say("KFS_SetKeyFlags", pair.name, index, mask, flags);
        Compare("flags", leaf.SetKeyFlags(index, mask, flags), KFS_SetKeyFlags(s, index, mask, flags));
        break;
    }
    case Tangents: {
        Numbers inX, outX;
        for (double const number : value) inX.push_back(number / 40.0 - 0.25);
        for (double const number : second) outX.push_back(number / 40.0 + 0.25);
        double const tall = step.b % 3 ? 1.0 : 0.01;
        Say("KFS_SetKeyTangentsF", pair.name, index, Given(first, inX), Given(first, value), Given(last, outX),
            Given(last, second), tall);
        Done const done = leaf.SetKeyTangents(index, Given(first, inX), &value, Given(last, outX), &second, tall);
        Compare("tangents", done,
                KFS_SetKeyTangentsF(s, index, first ? inX.data() : nullptr, value.data(), last ? outX.data() : nullptr,
                                    second.data(), tall));
        break;
    }
    case Velocity:
        Say("KFS_SetKeyVelocityF", pair.name, index, Given(first, value), Given(last, second));
        Compare("velocity", leaf.SetKeyVelocity(index, Given(first, value), Given(last, second)),
                KFS_SetKeyVelocityF(s, index, first ? value.data() : nullptr, last ? second.data() : nullptr));
        break;
    case Influence: {
        Numbers a, b;
        for (double const number : value) a.push_back(number / 16.0);
        for (double const number : second) b.push_back(std::fabs(number) / 25.0);
        Say("KFS_SetKeyInfluence", pair.name, index, Given(first, a), Given(last, b));
        Compare("influence", leaf.SetKeyInfluence(index, Given(first, a), Given(last, b)),
                KFS_SetKeyInfluence(s, index, first ? a.data() : nullptr, last ? b.data() : nullptr));
        break;
    }
    case SpaceTangents:
        Say("KFS_SetKeySpaceTangentsF", pair.name, index, -1, Given(first, value), Given(last, second));
        Compare("space tangents", leaf.SetKeySpaceTangents(index, Given(first, value), Given(last, second)),
                KFS_SetKeySpaceTangentsF(s, index, -1, first ? value.data() : nullptr, last ? second.data() : nullptr));
        break;
    case SpFlags: {
        unsigned int const mask = static_cast<unsigned int>(step.b) % 4, values = static_cast<unsigned int>(step.d) % 4;
        Say("KFS_SetKeySpFlags", pair.name, index, mask, values);
        Compare("spatial flags", leaf.SetKeySpFlags(index, mask, values), KFS_SetKeySpFlags(s, index, mask, values));
        break;
    }
    case SpModifiable:
        Say("KFS_SetKeySpModifiable", pair.name, +on, index);
        Compare("modifiable path", leaf.SetKeySpModifiable(on, index), KFS_SetKeySpModifiable(s, on, index));
        break;
    case SpContinuous:
        Say("KFS_SetKeySpContinuous", pair.name, +on, index);
        Compare("continuous path", leaf.SetKeySpContinuous(on, index), KFS_SetKeySpContinuous(s, on, index));
        break;
    case Scale: {
        unsigned int const scales[] = {24, 30, 600, 1000};
        unsigned int const scale = scales[step.a % 4];
        Say("KFS_RescaleStream", pair.name, scale);
        Compare("rescale", leaf.Rescale(scale), KFS_RescaleStream(s, scale));
        break;
    }
    case Constant: {
        // The record turns the constant's value: it is read first, and then given its codes.
        if (!leaf.set.constant && leaf.Count() > 0) Ask(pair, at);
        Say((pair.name + ".SetConstant").c_str(), 1, 1);
        Compare("constant", leaf.SetConstant(true, true), s->SetConstant(1, 1));
        Say("KFS_InsertKeyF", pair.name, &at, 1, &value, 1, 2);
        Compare("its value", leaf.InsertKey(at.value, true, &value, KFS_Interp_Hold, KFS_Interp_Hold),
                KFS_InsertKeyF(s, &at, 1, value.data(), KFS_Interp_Hold, KFS_Interp_Hold));
        break;
    }
    case Keyed:
        Say((pair.name + ".SetConstant").c_str(), 0, step.a % 4 != 0);
        Compare("keyed", leaf.SetConstant(false, step.a % 4 != 0), s->SetConstant(0, step.a % 4 != 0));
        break;
    case Parametrize:
        Say("KFS_SetStreamSParametrize", pair.name, +on);
        Compare("parametrise", leaf.SetSParametrize(on), KFS_SetStreamSParametrize(s, on));
        break;
    case Multiplier: {
        Numbers factors;
        for (double const number : value) factors.push_back(1.0 + std::fabs(number) / 20.0);
        Say("KFS_SetStreamMultiplier", pair.name, Given(true, factors), "nullptr");
        Compare("multiplier", leaf.SetMultiplier(factors), KFS_SetStreamMultiplier(s, factors.data(), nullptr));
        break;
    }
    case SpInterp: {
        auto const code = on && row_.options.dimension <= 3 ? KFS_SpInterp_Auto : static_cast<unsigned short>(0);
        Say("KFS_SetStreamSpInterp", pair.name, code);
        Compare("spatial interpolation", leaf.SetSpInterp(code), KFS_SetStreamSpInterp(s, code));
        break;
    }
    case Prepare: {
        Say((pair.name + ".PrepareSetValue").c_str(), &at);
        Done const done = leaf.PrepareSetValue(at.value);
        Compare("prepare", done, KFSp_Boundary([&] { s->PrepareSetValue(at); }));
        break;
    }
    case Force:
        Say("KFS_ForceUpdateStream", pair.name);
        Compare("force", leaf.ForceUpdate(), KFS_ForceUpdateStream(s));
        break;
    default: break;
    }
}

void World::AskHandles(Pair& pair, Step const& step, int index)
{
    KFS_Stream* const s = pair.stream;
    Leaf& leaf = pair.leaf;
    auto const size = static_cast<std::size_t>(row_.options.dimension);
    Numbers const blank(row_.options.spatial && step.op != ReadSpaceTangents ? 1 : size, 77.0);
    Numbers e[4] = {blank, blank, blank, blank}, a[4] = {blank, blank, blank, blank};
    for (Numbers& numbers : a) numbers.resize(size, 77.0);
    switch (step.op) {
    case ReadTangents:
        Say("KFS_GetKeyTangentsF", pair.name, index, "inX", "inY", "outX", "outY");
        Compare("read tangents", leaf.GetKeyTangents(index, e[0], e[1], e[2], e[3]),
                KFS_GetKeyTangentsF(s, index, a[0].data(), a[1].data(), a[2].data(), a[3].data()));
        break;
    case ReadVelocity: {
        bool const ends = step.b % 2;
        Say("KFS_GetKeyVelocityF", pair.name, index, ends, "in", "out");
        Compare("read velocity", leaf.GetKeyVelocity(index, ends, e[0], e[1]),
                KFS_GetKeyVelocityF(s, index, ends, a[0].data(), a[1].data()));
        break;
    }
    case ReadInfluence:
        Say("KFS_GetKeyInfluence", pair.name, index, "in", "out");
        Compare("read influence", leaf.GetKeyInfluence(index, e[0], e[1]),
                KFS_GetKeyInfluence(s, index, a[0].data(), a[1].data()));
        break;
    case ReadClamped: {
        e[0] = a[0] = Value(step.c);
        e[2] = a[2] = Value(step.d);
        e[1] = a[1] = e[3] = a[3] = Numbers(size, 0.1 + step.b % 10 / 10.0);
        Say("KFS_GetClampedVelInflF", pair.name, index, 0, &std::as_const(e[0]), &std::as_const(e[1]),
            &std::as_const(e[2]), &std::as_const(e[3]), "&clamped");
        bool expected = false;
        unsigned char actual = 0;
        Done const done = leaf.GetClamped(index, e[0], e[1], e[2], e[3], expected);
        Compare("clamp", done,
                KFS_GetClampedVelInflF(s, index, 0, a[0].data(), a[1].data(), a[2].data(), a[3].data(), &actual));
        Same("clamped", expected, actual != 0);
        break;
    }
    default:
        Say("KFS_GetKeySpaceTangentsF", pair.name, index, -1, "in", "out");
        Compare("read space tangents", leaf.GetKeySpaceTangents(index, e[0], e[1]),
                KFS_GetKeySpaceTangentsF(s, index, -1, a[0].data(), a[1].data()));
        break;
    }
    // What a constant's sides say about speeds of lines isn't told.
    if (step.op == ReadVelocity && leaf.set.constant) return;
    for (std::size_t i = 0; i < 4; ++i) Same("answer " + std::to_string(i), e[i], a[i]);
}

void World::RunQuestion(Pair& pair, Step const& step)
{
    KFS_Stream* const s = pair.stream;
    Leaf& leaf = pair.leaf;
    int const index = Index(pair, step.a);
    T_Time const at = pair.stream.Time(TimeOf(step.b));
    int expected = 77, actual = 77;
    bool expectedFound = false;
    unsigned char actualFound = 0;
    T_Time expectedTime{77, 77}, actualTime{77, 77};
    switch (step.op) {
    case Update:
        Say((pair.name + ".UpdateStream").c_str());
        leaf.Update();
        Compare("update", {}, s->UpdateStream());
        break;
    case Read: Ask(pair, at); break;
    case ReadTangents:
    case ReadVelocity:
    case ReadInfluence:
    case ReadClamped:
    case ReadSpaceTangents: AskHandles(pair, step, index); break;
    case ReadKey: {
        Say("KFS_GetKeyF", pair.name, index, "value", "&in", "&out");
        Numbers value(static_cast<std::size_t>(row_.options.dimension), 77.0), actualValue = value;
        int in = 77, out = 77;
        char actualIn = 77, actualOut = 77;
        Done const done = leaf.GetKey(index, value, in, out);
        Compare("read a key", done, KFS_GetKeyF(s, index, actualValue.data(), &actualIn, &actualOut));
        if (done.code != 0) break;
        Same("value", value, actualValue);
        Same("in code", in, static_cast<int>(actualIn));
        Same("out code", out, static_cast<int>(actualOut));
        break;
    }
    case Find: {
        bool const backward = step.c % 2, exact = step.d % 2;
        auto const direction = static_cast<short>((backward ? KFS_Find_Backward : 0) | (exact ? KFS_Find_AtTime : 0));
        Say("KFS_FindKeyTime", pair.name, &at, direction, "&found", "&index", "&keyTime");
        Done const done = leaf.FindKeyTime(at.value, backward, exact, expectedFound, expected, expectedTime);
        Compare("find", done, KFS_FindKeyTime(s, &at, direction, &actualFound, &actual, &actualTime));
        Same("found", expectedFound, actualFound != 0);
        Same("index", expected, actual);
        Same("key time", expectedTime, actualTime);
        break;
    }
    case Nearest:
        Say("KFS_FindNearestKeyTime", pair.name, &at, "&index", "&keyTime");
        Compare("nearest", leaf.FindNearest(at.value, expected, expectedTime),
                KFS_FindNearestKeyTime(s, &at, &actual, &actualTime));
        Same("index", expected, actual);
        Same("key time", expectedTime, actualTime);
        break;
    case ToIndex:
        Say("KFS_TimeToIndex", pair.name, &at, "&index");
        Compare("time to index", leaf.TimeToIndex(at.value, expected), KFS_TimeToIndex(s, &at, &actual));
        Same("index", expected, actual);
        break;
    case KeyIndex:
        Say("KFS_GetKeyIndex", pair.name, &at, "&index", "&found");
        Compare("key index", leaf.GetKeyIndex(at.value, expected, expectedFound),
                KFS_GetKeyIndex(s, &at, &actual, &actualFound));
        Same("index", expected, actual);
        Same("found", expectedFound, actualFound != 0);
        break;
    case ToTime:
        Say("KFS_IndexToTime", pair.name, index, "&time");
        Compare("index to time", leaf.IndexToTime(index, expectedTime), KFS_IndexToTime(s, index, &actualTime));
        Same("time", expectedTime, actualTime);
        break;
    case Walk: {
        T_Time const until = pair.stream.Time(TimeOf(step.c));
        T_Time const* const from = step.d % 3 ? &at : nullptr;
        T_Time const* const to = step.d % 4 ? &until : nullptr;
        Say("KFS_ForRange", pair.name, from, to, "&times", "push", "nullptr");
        std::vector<int> expectedTimes, actualTimes;
        auto const push = [](KFS_Stream*, long times, int, KFS_KeyScalar* key) {
            reinterpret_cast<std::vector<int>*>(times)->push_back(key->time);
            return 0;
        };
        Compare("walk", leaf.ForRange(from ? &at.value : nullptr, to ? &until.value : nullptr, expectedTimes),
                KFS_ForRange(s, from, to, reinterpret_cast<long>(&actualTimes), push, nullptr));
        Same("walked", testing::PrintToString(expectedTimes), testing::PrintToString(actualTimes));
        break;
    }
    case Predict: {
        auto const action = static_cast<unsigned short>(step.a % 8);
        Say("KFS_PredictInvalid", pair.name, action, &at, "&from", "&to");
        int from = 77, to = 77;
        Done const done = leaf.PredictInvalid(action, at.value, from, to);
        T_Time actualTo{};
        Compare("predict", done, KFS_PredictInvalid(s, action, &at, &actualTime, &actualTo));
        if (done.code != 0) break;
        Same("from", from, actualTime.value);
        Same("to", to, actualTo.value);
        break;
    }
    default: {
        Say("KFS_ChooseInterps", pair.name, &at, "&in", "&out");
        int in, out;
        unsigned int flags, spFlags;
        leaf.Choose(at.value, in, out, flags, spFlags);
        char actualIn = 77, actualOut = 77;
        Compare("propose", {}, KFS_ChooseInterps(s, &at, &actualIn, &actualOut));
        Same("in code", in, static_cast<int>(actualIn));
        Same("out code", out, static_cast<int>(actualOut));
        break;
    }
    }
}

// ---- running and cutting down

// What went wrong, and by which calls; both empty if nothing did. `length`: how many steps it took.
struct Outcome {
    std::string fault, calls;
    std::size_t length = 0;
};

Outcome RunScript(Row const& row, std::vector<Step> const& script, ReportRecorder& reports)
{
    World world(row, reports);
    for (std::size_t i = 0; i < script.size(); ++i) {
        std::string const fault = world.Take(script[i]);
        if (!fault.empty()) return {fault, world.Calls(), i + 1};
    }
    return {world.TakeAll(), world.Calls(), script.size()};
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
            ADD_FAILURE() << row.why << ", seed " << seed << ":\n" << outcome.calls << outcome.fault;
            break;
        }
    }
    reports.Take();
}

}  // namespace
