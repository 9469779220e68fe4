// The twin's curves: what lies between the keys, and what keys get from their neighbours.
#include "tests/curves/leafmodel.h"

#include "frame/errors.h"
#include "frame/services/sequence.h"
#include "frame/services/time.h"

#include <algorithm>
#include <cmath>

namespace leafmodel {

namespace {

constexpr double Sixth = 0.16666666667;

// A cubic with room for its points.
struct Curve {
    explicit Curve(std::size_t dimension)
        : points{Numbers(dimension), Numbers(dimension), Numbers(dimension), Numbers(dimension)}
    {
        head = {static_cast<short>(dimension), points[0].data(), points[1].data(), points[2].data(), points[3].data()};
    }
    Curve(Curve const&) = delete;
    Curve& operator=(Curve const&) = delete;

    std::array<Numbers, 4> points;
    CRV_Curve head;
};

struct Side {
    bool linear;
    double speed, influence;
};

// A graph over seconds that begins at (0, from).
void Graph(Curve& curve, double dt, double from, double to, Side const& out, Side const& in)
{
    double const g = out.influence * dt, h = -in.influence * dt, rise = (to - from) * Sixth;
    curve.points[0] = {0.0, from};
    curve.points[1] = out.linear ? Numbers{Sixth * dt, from + rise} : Numbers{g, from + g * out.speed};
    curve.points[2] = in.linear ? Numbers{dt - Sixth * dt, to - rise} : Numbers{dt + h, to + h * in.speed};
    curve.points[3] = {dt, to};
    for (std::size_t i = 0; i < 4; ++i) (&curve.head.p0)[i] = curve.points[i].data();
}

void Path(Curve& curve, Key const& a, Key const& b, std::array<double, 4> const& multiplier)
{
    for (std::size_t i = 0; i < a.value.size(); ++i) {
        double const m = multiplier[i & 3];
        curve.points[0][i] = m * a.value[i];
        curve.points[3][i] = m * b.value[i];
        curve.points[1][i] = m * a.outTangent[i] + curve.points[0][i];
        curve.points[2][i] = m * b.inTangent[i] + curve.points[3][i];
    }
}

constexpr std::array<double, 4> Unscaled{1.0, 1.0, 1.0, 1.0};

bool IsZero(Numbers const& numbers)
{
    return std::all_of(
        numbers.begin(), numbers.end(), [](double number) { return number == 0.0; });
}

Numbers Between(Key const& a, Key const& b, double t)
{
    Numbers value;
    for (std::size_t i = 0; i < a.value.size(); ++i) value.push_back(a.value[i] + (b.value[i] - a.value[i]) * t);
    return value;
}

bool IsHold(Key const& a, Key const& b)
{
    return a.out == KFS_Interp_Hold || b.in == KFS_Interp_Hold;
}

bool IsLine(Key const& a, Key const& b)
{
    return a.out == KFS_Interp_Linear && b.in == KFS_Interp_Linear;
}

Side OutOf(Key const& a, std::size_t i)
{
    return {a.out == KFS_Interp_Linear, a.outSpeed[i], a.outInfluence[i]};
}

Side InTo(Key const& b, std::size_t i)
{
    return {b.in == KFS_Interp_Linear, b.inSpeed[i], b.inInfluence[i]};
}

}  // namespace

// ---- repair

double Leaf::Length(int index) const
{
    Curve path(static_cast<std::size_t>(set.dimension));
    Path(path, At(index), At(index + 1), set.multiplier);
    SEQ_Head** table = nullptr;
    double length = 0.0;
    EXPECT_EQ(0, CRV_BuildArcSpline(&path.head, &table, &length, set.accuracy));
    EXPECT_EQ(0, SEQ_Dispose(table, 0));
    return length;
}

void Leaf::Update()
{
    if (stale.IsNone() && arcStale.IsNone()) return;
    int const last = Count() - 1;
    Range const tangents{stale.first, std::min(stale.last, last)}, arcs{arcStale.first, std::min(arcStale.last, last)};
    if (set.spatial && !arcs.IsNone()) {
        for (int i = arcs.first; i <= arcs.last; ++i) {
            bool const given = !(At(i).spFlags & KFS_KeySpFlag_Modifiable) && At(i).Has(KFS_KeyFlag_TangentsSet);
            if (!given && IsAuto()) SetDefaultTangents(At(i).time, 2, At(i));
        }
        bool const curved = set.sParametrize && (set.dimension == 2 || set.dimension == 3);
        for (int i = arcs.first; i < arcs.last; ++i) {
            Numbers apart;
            for (std::size_t d = 0; d < At(i).value.size(); ++d) apart.push_back(At(i + 1).value[d] - At(i).value[d]);
            double sum = 0.0;
            for (double const number : apart) sum += number * number;
            At(i).arc = curved ? Length(i) : std::sqrt(sum);
        }
        if (!curved && arcs.first < last && arcs.last == last) At(last).arc = 0.0;
    }
    if (!tangents.IsNone()) {
        for (int i = tangents.first; i <= tangents.last; ++i)
            if (At(i).Has(KFS_KeyFlag_Modifiable) && At(i).HasSpline()) SetDefaultTangents(At(i).time, 1, At(i));
        for (int i = tangents.first; set.spatial && i <= tangents.last; ++i)
            if (Floats(i)) ComputeFloatTime(i);
    }
    stale = arcStale = {};
}

void Leaf::SetDefaultTangents(int time, int mode, Key& key)
{
    Around const around = Neighbours(time, false);
    auto const timeOf = [&](int index) { return At(index).time; };
    auto const span = [&](int from, int to) { return from >= 0 && to >= 0 ? timeOf(to) - timeOf(from) : 0; };
    bool const straightIn = key.in == KFS_Interp_Linear && key.out == KFS_Interp_Spline;
    bool const straightOut = key.in == KFS_Interp_Spline && key.out == KFS_Interp_Linear;
    int units =
        around.prev >= 0 ? span(around.prev, around.next >= 0 ? around.next : around.at) : span(around.at, around.next);
    if (straightIn) units = span(around.prev, around.at);
    if (straightOut) units = span(around.at, around.next);
    double const dt = static_cast<double>(units) / static_cast<double>(set.scale);
    using Level = std::optional<double>;
    auto const slope = [&](Level prev, Level at, Level next) {
        if (straightIn) next.reset();
        if (straightOut) prev.reset();
        if (prev && next) return (*next - *prev) / dt;
        if (prev && at) return (*at - *prev) / dt;
        return at && next ? (*next - *at) / dt : 0.0;
    };
    if (mode & 1) {
        for (std::size_t i = 0; i < key.inSpeed.size(); ++i) {
            Level prev, at, next;
            if (!set.spatial) {
                if (around.prev >= 0) prev = At(around.prev).value[i];
                if (around.at >= 0) at = At(around.at).value[i];
                if (around.next >= 0) next = At(around.next).value[i];
            } else if (around.prev >= 0 && around.next >= 0) {  // a middle key has no distance of its own
                prev = 0.0;
                next = ArcsFrom(around.prev, around.next);
            } else if (around.prev >= 0 && around.at >= 0) {
                prev = 0.0;
                at = ArcsFrom(around.prev, around.at);
            } else if (around.at >= 0 && around.next >= 0) {
                at = 0.0;
                next = ArcsFrom(around.at, around.next);
            }
            key.inSpeed[i] = key.outSpeed[i] = slope(prev, at, next);
            key.inInfluence[i] = key.outInfluence[i] = Sixth;
        }
        key.flags |= KFS_KeyFlag_Continuous;
    }
    if (!(mode & 2) || !set.spatial) return;
    Around const beside = Neighbours(time, true);
    bool const straight = (beside.prev < 0 || IsZero(At(beside.prev).inTangent)) &&
                          (beside.next < 0 || IsZero(At(beside.next).outTangent));
    Numbers out(key.value.size(), 0.0);
    Numbers in = out;
    int const from = beside.prev >= 0 ? beside.prev : beside.at;
    int const to = beside.next >= 0 ? beside.next : beside.at;
    if (!(straight && !(key.spFlags & KFS_KeySpFlag_Modifiable)) && from >= 0 && to >= 0 && from != to) {
        for (std::size_t i = 0; i < out.size(); ++i) {
            out[i] = (At(to).value[i] - At(from).value[i]) * Sixth;
            in[i] = -out[i];
        }
        auto const near = [&](int a, int b) {
            for (std::size_t i = 0; i < out.size(); ++i)
                if (!(std::fabs(At(a).value[i] - At(b).value[i]) < 1e-12)) return false;
            return true;
        };
        if (beside.prev >= 0 && beside.at >= 0 && beside.next >= 0) {
            if (near(beside.next, beside.at)) std::fill(out.begin(), out.end(), 0.0);
            if (near(beside.prev, beside.at)) std::fill(in.begin(), in.end(), 0.0);
        }
    }
    key.inTangent = in;
    key.outTangent = out;
    key.spFlags |= KFS_KeySpFlag_Continuous;
    key.flags |= KFS_KeyFlag_TangentsSet;
}

void Leaf::ComputeFloatTime(int index)
{
    Around const around = NeighboursOf(index, false);
    if (around.next - around.prev < 2 || around.prev < 0 || around.next < 0) return;
    Key const& prev = At(around.prev);
    Key const& next = At(around.next);
    double const s = ArcsFrom(around.prev, index), total = ArcsFrom(around.prev, around.next);
    int time = prev.time;
    if (prev.out == KFS_Interp_Hold) {
    } else if (IsLine(prev, next)) {
        time =
            total == 0.0 && s == 0.0 ? prev.time : static_cast<int>((next.time - prev.time) * (s / total) + prev.time);
    } else if (next.in != KFS_Interp_Hold) {
        Curve graph(2);
        Graph(graph, Seconds(next.time, prev.time), 0.0, total, OutOf(prev, 0), InTo(next, 0));
        EXPECT_EQ(0, CRV_CurveSetNonDecreasing(&graph.head, nullptr));
        double x = 0.0;
        EXPECT_EQ(0, CRV_EvaluateXFromY(&graph.head, &x, s));
        time = prev.time + T_FpLong2TimeValue(set.scale, x);
    }
    time = std::clamp(time, prev.time + (index - around.prev), next.time - (around.next - index));
    for (int tries = 0; tries < 10 * Count(); ++tries) {
        int const there = Find(time);
        if (there < 0 || there == index) break;
        time += there > index ? -1 : 1;
    }
    At(index).time = time;
}

// ---- splits

namespace {

// One component's graph is split: the new key's value and handles, and what is left of the neighbours'.
void Split(Curve& curve, double dt, double x, Key& a, Key& b, Key& key, std::size_t i, double* value, bool reread)
{
    if (reread) {
        a.outInfluence[i] = std::fabs((curve.points[1][0] - curve.points[0][0]) / dt);
        b.inInfluence[i] = std::fabs((curve.points[2][0] - curve.points[3][0]) / dt);
    }
    double t = 0.0;
    if (CRV_TFromX(&curve.head, &t, x) != 0) return;
    double rows[5][2];
    if (CRV_SubdivideCurve(&curve.head, &rows[0][0], t) != 0) return;
    auto const slope = [](double const* p, double px, double py) {
        return p[0] == px ? 0.0 : (p[1] - py) / (p[0] - px);
    };
    double const v = rows[2][1];
    *value = v;
    key.inSpeed[i] = slope(rows[1], x, v);
    key.inInfluence[i] = std::fabs((rows[1][0] - x) / x);
    key.outSpeed[i] = slope(rows[3], x, v);
    key.outInfluence[i] = std::fabs((rows[3][0] - x) / (dt - x));
    a.outSpeed[i] = slope(rows[0], curve.points[0][0], curve.points[0][1]);
    a.outInfluence[i] = std::fabs((rows[0][0] - curve.points[0][0]) / x);
    b.inSpeed[i] = slope(rows[4], curve.points[3][0], curve.points[3][1]);
    b.inInfluence[i] = std::fabs((rows[4][0] - curve.points[3][0]) / (x - dt));
}

// A linear side has its handle on the chord; the later one's place is a literal of its own.
void SplitGraph(Curve& curve, double dt, double from, double to, Side const& out, Side const& in)
{
    Graph(curve, dt, from, to, out, in);
    if (in.linear) curve.points[2] = {0.83333333333 * dt, (to - from) * -Sixth + to};
    curve.head.p2 = curve.points[2].data();
}

}  // namespace

void Leaf::SplitHandles(Around const& around, Key& key, double x, double dt)
{
    if (around.prev < 0 || around.next < 0) {
        int const only = around.prev >= 0 ? around.prev : around.next;
        if (only >= 0) key.value = At(only).value;
        return;
    }
    Key& a = At(around.prev);
    Key& b = At(around.next);
    unsigned char changed = 0;
    for (std::size_t i = 0; i < key.value.size(); ++i) {
        Curve curve(2);
        SplitGraph(curve, dt, a.value[i], b.value[i], OutOf(a, i), InTo(b, i));
        EXPECT_EQ(0, set.nonDecreasing ? CRV_CurveSetNonDecreasing(&curve.head, &changed) : 0);
        Split(curve, dt, x, a, b, key, i, &key.value[i], changed != 0);
    }
}

void Leaf::SplitSpeeds(Around const& around, Key& key, double x, double dt)
{
    Key& a = At(around.prev);
    Key& b = At(around.next);
    Curve curve(2);
    SplitGraph(curve, dt, 0.0, ArcsFrom(around.prev, around.next), OutOf(a, 0), InTo(b, 0));
    unsigned char changed = 0;
    EXPECT_EQ(0, set.nonDecreasing ? CRV_CurveSetNonDecreasing(&curve.head, &changed) : 0);
    double distance = 0.0;
    Split(curve, dt, x, a, b, key, 0, &distance, changed != 0);
}

// The value that the stream has there, for a key that no handles are split for.
void Leaf::TakeValue(Key& key, Around const& around)
{
    if (around.prev >= 0 && around.next >= 0) {
        Key const& a = At(around.prev);
        if (!set.spatial && IsHold(a, At(around.next)))
            key.value = a.out == KFS_Interp_Hold ? a.value : At(around.next).value;
        else
            key.value = set.spatial ? InterpolatePath(key.time) : Interpolate(key.time);
    } else {
        key.value = At(around.prev >= 0 ? around.prev : around.next).value;
    }
}

void Leaf::SplitPath(Around const& beside, Key& key, double t)
{
    Key& a = At(beside.prev);
    Key& b = At(beside.next);
    Curve path(key.value.size());
    Path(path, a, b, Unscaled);
    Numbers rows(5 * key.value.size());
    EXPECT_EQ(0, CRV_SubdivideCurve(&path.head, rows.data(), t));
    for (std::size_t i = 0; i < key.value.size(); ++i) {
        auto const row = [&](std::size_t r) { return rows[r * key.value.size() + i]; };
        a.outTangent[i] = row(0) - a.value[i];
        b.inTangent[i] = row(4) - b.value[i];
        key.value[i] = row(2);
        key.inTangent[i] = row(1) - row(2);
        key.outTangent[i] = row(3) - row(2);
    }
    key.flags |= KFS_KeyFlag_TangentsSet;
    for (Key* const each : {&key, &a, &b}) each->spFlags &= ~unsigned{KFS_KeySpFlag_Modifiable};
    if (IsZero(a.inTangent) && IsZero(b.outTangent)) {
        key.inTangent.assign(key.inTangent.size(), 0.0);
        key.outTangent = key.inTangent;
    }
}

void Leaf::Subdivide(int time, int mode, Key& key, bool isNew)
{
    Update();
    if (!isNew) time = key.time;
    Around const around = Neighbours(time, false);
    bool const between = around.prev >= 0 && around.next >= 0;
    double dt = between ? Seconds(At(around.next).time, At(around.prev).time) : 0.0;
    double x = around.prev >= 0 ? Seconds(time, At(around.prev).time) : 0.0;
    if (isNew) {
        key.inSpeed.assign(key.inSpeed.size(), 0.0);
        key.outSpeed = key.inSpeed;
        key.inInfluence.assign(key.inSpeed.size(), Sixth);
        key.outInfluence = key.inInfluence;
    }
    auto const settle = [&] {
        key.flags &= ~unsigned{KFS_KeyFlag_Modifiable};
        for (int const index : {around.prev, around.next})
            if (index >= 0) At(index).flags &= ~unsigned{KFS_KeyFlag_Modifiable};
    };
    if (!set.spatial) {
        bool const held = between && IsHold(At(around.prev), At(around.next));
        if (mode & 1) {
            SplitHandles(around, key, x, dt);
            settle();
            if (around.prev >= 0 && At(around.prev).out == KFS_Interp_Linear) At(around.prev).out = KFS_Interp_Spline;
            if (around.next >= 0 && At(around.next).in == KFS_Interp_Linear) At(around.next).in = KFS_Interp_Spline;
        }
        if (isNew && (held || !(mode & 1))) TakeValue(key, around);
        return;
    }
    if ((mode & 2) && between) {
        PathPlace const place = FindOnPath(time);
        Around const beside = Neighbours(time, true);
        if (place.segment == beside.prev && place.segment + 1 == beside.next)
            SplitPath(beside, key, place.t), MarkArcs(around.next, around.next - around.prev);
        else if (isNew)
            TakeValue(key, around);  // float keys that crowd have other times than the point that comes by
    } else if (isNew) {
        TakeValue(key, around);
    }
    if (!(mode & 1) || !between) return;
    // Float keys that are no anchors may have moved with the repair that finding the place has brought.
    dt = Seconds(At(around.next).time, At(around.prev).time);
    x = Seconds(time, At(around.prev).time);
    SplitSpeeds(around, key, x, dt);
    settle();
}

// ---- values

Numbers Leaf::Interpolate(int time)
{
    Around const around = Neighbours(time, false);
    Key const& a = At(around.prev);
    Key const& b = At(around.next);
    if (IsLine(a, b)) return Between(a, b, static_cast<double>(time - a.time) / static_cast<double>(b.time - a.time));
    Numbers value;
    for (std::size_t i = 0; i < a.value.size(); ++i) {
        Curve curve(2);
        Graph(curve, Seconds(b.time, a.time), a.value[i], b.value[i], OutOf(a, i), InTo(b, i));
        EXPECT_EQ(0, set.nonDecreasing ? CRV_CurveSetNonDecreasing(&curve.head, nullptr) : 0);
        double answer = 0.0;
        EXPECT_EQ(0, CRV_EvaluateYFromX(&curve.head, &answer, Seconds(time, a.time)));
        value.push_back(answer);
    }
    return value;
}

double Leaf::SpeedGraph(Key const& a, Key const& b, double total, int time) const
{
    Curve graph(2);
    Graph(graph, Seconds(b.time, a.time), 0.0, total, OutOf(a, 0), InTo(b, 0));
    EXPECT_EQ(0, CRV_CurveSetNonDecreasing(&graph.head, nullptr));
    double answer = 0.0;
    EXPECT_EQ(0, CRV_EvaluateYFromX(&graph.head, &answer, Seconds(time, a.time)));
    return answer;
}

Leaf::PathPlace Leaf::FindOnPath(int time)
{
    Around const around = Neighbours(time, false);
    PathPlace place{around.prev, around.next, around.prev, 0.0, {}};
    Key const a = At(place.a), b = At(place.b);
    double const total = ArcsFrom(place.a, place.b);
    double s = 0.0;
    if (IsLine(a, b))
        s = static_cast<double>(time - a.time) / static_cast<double>(b.time - a.time) * total;
    else if (!IsHold(a, b))
        s = SpeedGraph(a, b, total, time);
    if (IsAuto())
        while (place.segment < place.b - 1 && At(place.segment).arc < s) s -= At(place.segment++).arc;
    Curve path(a.value.size());
    Path(path, At(place.segment), At(place.segment + 1), Unscaled);
    place.curve = path.points;
    if (set.sParametrize) {
        Curve scaled(a.value.size());
        Path(scaled, At(place.segment), At(place.segment + 1), set.multiplier);
        SEQ_Head** table = nullptr;
        double length = 0.0;
        EXPECT_EQ(0, CRV_BuildArcSpline(&scaled.head, &table, &length, set.accuracy));
        EXPECT_EQ(0, CRV_TFromSSpline(&path.head, &table, &place.t, s, 1.0));
        EXPECT_EQ(0, SEQ_Dispose(table, 0));
    } else {
        ForceUpdate();  // no key has a table, which is taken for a stream that was never repaired
        place.t = total != 0.0 ? s / total : 0.0;
    }
    return place;
}

Numbers Leaf::InterpolatePath(int time)
{
    PathPlace const place = FindOnPath(time);
    if (!IsAuto()) return Between(At(place.a), At(place.b), place.t);
    Curve path(place.curve[0].size());
    for (std::size_t i = 0; i < 4; ++i) std::copy(place.curve[i].begin(), place.curve[i].end(), path.points[i].begin());
    Numbers point(place.curve[0].size());
    EXPECT_EQ(0, CRV_EvaluatePoint(&path.head, point.data(), place.t));
    return point;
}

Done Leaf::GetValue(int time, Numbers& value, bool& atKey)
{
    if (HasNoValue()) return NoKeys(36, "get a value from");
    if (set.constant) {
        single->time = time;
        value = single->value;
        atKey = true;
        return {};
    }
    int found = Find(time);
    if (found < 0 || (set.spatial && At(found).Has(KFS_KeyFlag_Float))) {
        Update();
        found = Find(time);
    }
    atKey = found >= 0;
    int const next = LowerBound(time);
    if (found >= 0)
        value = At(found).value;
    else if (next == 0)
        value = keys.front().value;
    else if (next == Count())
        value = keys.back().value;
    else if (set.spatial)
        value = InterpolatePath(time);
    else if (IsHold(At(next - 1), At(next)))
        value = At(At(next - 1).out == KFS_Interp_Hold ? next - 1 : next).value;
    else
        value = Interpolate(time);
    return {};
}

}  // namespace leafmodel
