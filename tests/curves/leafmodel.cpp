// The twin's keys: edits, marks, lookups and handles. What lies between the keys is in leafmodelcurves.cpp.
#include "tests/curves/leafmodel.h"

#include "frame/errors.h"
#include "frame/services/sequence.h"
#include "keystore/lookup.h"

#include <algorithm>
#include <climits>
#include <cmath>
#include <utility>

namespace leafmodel {

namespace {

constexpr double Sixth = 0.16666666667;
char const* const Overwrite = "attempt to overwrite an already existing time stream key value.";
char const* const Inquire = "inquire about a key value in";
char const* const Alter = "alter a key value in";
char const* const Get = "get a value from";

// Halves away from zero. Sixty-four bits hold the products exactly.
std::optional<int> Rescaled(int time, unsigned int from, unsigned int to)
{
    if (from == to) return time;
    long double const exact = std::round(static_cast<long double>(time) * to / from);
    return std::fabs(exact) < 2147483648.0L ? std::optional(static_cast<int>(exact)) : std::nullopt;
}

bool IsZero(Numbers const& numbers)
{
    return std::all_of(
        numbers.begin(), numbers.end(), [](double number) { return number == 0.0; });
}

double Square(Numbers const& numbers)
{
    double sum = 0.0;
    for (double const number : numbers) sum += number * number;
    return sum;
}

}  // namespace

// ---- small things

Done Leaf::Refuse(int code, int operation, std::string const& text) const
{
    return {code, {KfsReport(operation, text)}, 0};
}

Done Leaf::NoKeys(int operation, std::string const& action) const
{
    return Refuse(KFS_Err_NoKeys, operation, "attempt to " + action + " a time stream with no key values.");
}

Done Leaf::Check(int index, int operation, std::string const& action) const
{
    return HasNoValue() ? NoKeys(operation, action) : Done{IsBadIndex(index) ? SEQ_Err_BadIndex : 0, {}, 0};
}

bool Leaf::CanDo(int code, Done& done) const
{
    bool const can = code == 0 || (code < 0 ? (set.interpMask & 8) != 0 : ((set.interpMask >> (code - 1)) & 1) != 0);
    if (!can)
        done = Refuse(KFS_Err_InterpNotAllowed, 13,
                      "interpolation method not allowed for this stream (" + std::to_string(code) + ").");
    return can;
}

bool Leaf::Floats(int index) const
{
    return At(index).Has(KFS_KeyFlag_Float) && index > 0 && index < Count() - 1;
}

int Leaf::LowerBound(int time) const
{
    int index = 0;
    while (index < Count() && At(index).time < time) ++index;
    return index;
}

int Leaf::Find(int time) const
{
    int const index = LowerBound(time);
    return index < Count() && At(index).time == time ? index : -1;
}

double Leaf::Seconds(int later, int earlier) const
{
    return static_cast<double>(later - earlier) / static_cast<double>(set.scale);
}

double Leaf::ArcsFrom(int first, int last) const
{
    double sum = 0.0;
    for (int i = first; i < last; ++i) sum += At(i).arc;
    return sum;
}

Key Leaf::EmptyKey(int time, int in, int out) const
{
    Key key;
    key.time = time;
    key.in = in;
    key.out = out;
    auto const size = static_cast<std::size_t>(set.dimension);
    key.value.assign(size, 0.0);
    Numbers const handles(set.spatial ? 1 : size, 0.0);
    key.inSpeed = key.inInfluence = key.outSpeed = key.outInfluence = handles;
    if (set.spatial) {
        key.flags = KFS_KeyFlag_SpatialBlock;
        key.inTangent = key.outTangent = key.value;
    }
    return key;
}

Around Leaf::Neighbours(int time, bool allKeys) const
{
    int const position = LowerBound(time), found = Find(time);
    if (found < 0) return Anchors({-1, position - 1, position < Count() ? position : -1}, allKeys);
    Around around = NeighboursOf(found, allKeys);
    around.at = found;
    return around;
}

Around Leaf::NeighboursOf(int index, bool allKeys) const
{
    return Anchors({-1, index - 1, index + 1 < Count() ? index + 1 : -1}, allKeys);
}

Around Leaf::Anchors(Around around, bool allKeys) const
{
    if (allKeys || !set.spatial || !set.sParametrize) return around;
    while (around.next >= 0 && around.next < Count() - 1 && At(around.next).Has(KFS_KeyFlag_Float)) ++around.next;
    while (around.prev > 0 && At(around.prev).Has(KFS_KeyFlag_Float)) --around.prev;
    return around;
}

// ---- marks

Range Leaf::Marked(int index, int count) const
{
    int const last = Count() - 1;
    int const from = index == -1 ? last : index;
    return count < 1 ? Range{} : Range{std::clamp(from - count, 0, last), std::clamp(from, 0, last)};
}

namespace {

void Merge(Range const& mark, Range& into)
{
    if (mark.IsNone()) return;
    into = into.IsNone() ? mark : Range{std::min(into.first, mark.first), std::max(into.last, mark.last)};
}

// A range keeps the keys that it had when one comes in or goes.
void ShiftUp(Range& range, int inserted)
{
    if (!range.IsNone() && range.last >= inserted) ++range.last;
}

void PullIn(Range& range, int count)
{
    if (!range.IsNone() && range.last >= count) range.last = count - 1;
}

}  // namespace

void Leaf::Mark(int index, int count)
{
    if (set.constant || keys.empty()) {
        stale = {};
        return;
    }
    Range mark = Marked(index, count);
    if (set.spatial && !mark.IsNone()) {
        while (mark.first > 0 && At(mark.first).Has(KFS_KeyFlag_Float)) --mark.first;
        while (mark.last < Count() - 1 && At(mark.last).Has(KFS_KeyFlag_Float)) ++mark.last;
    }
    Merge(mark, stale);
}

void Leaf::MarkArcs(int index, int count)
{
    if (set.constant || keys.empty())
        arcStale = {};
    else
        Merge(Marked(index, count), arcStale);
}

void Leaf::UpdateIfStale(int index)
{
    if (stale.Holds(index)) Update();
}

Done Leaf::ForceUpdate()
{
    Mark(-1, Count());
    if (set.spatial) MarkArcs(-1, Count());
    Update();
    return {};
}

// ---- inserting, changing, removing

void Leaf::Choose(int time, int& in, int& out, unsigned int& flags, unsigned int& spFlags) const
{
    in = out = 0;
    flags = spFlags = 0;
    if (set.constant) {
        if (single) {
            in = single->in;
            out = in == KFS_Interp_Hold ? in : single->out;
        }
        return;
    }
    if (keys.empty()) return;
    int const position = LowerBound(time);
    auto const take = [&](Key const& key, int code) {
        in = out = code;
        flags = key.flags;
        spFlags = key.spFlags;
    };
    if (int const found = Find(time); found >= 0) {
        take(At(found), At(found).in);
        out = At(found).out;
    } else if (position == 0) {
        take(At(0), At(0).in);
    } else if (position == Count()) {
        take(keys.back(), keys.back().out);
    } else {
        Key const& a = At(position - 1);
        Key const& b = At(position);
        in = a.out;
        out = b.in;
        flags = a.flags & b.flags;
        spFlags = a.spFlags & b.spFlags;
        if ((in == KFS_Interp_Spline) != (out == KFS_Interp_Spline)) in = out = KFS_Interp_Spline;
    }
    if (in == KFS_Interp_Hold) out = KFS_Interp_Hold;
}

// Answers the key's place, or -1.
int Leaf::InsertFromCache(Key key, bool overwrite, bool valueGiven, bool tangentsGiven, Done& done)
{
    if (set.constant) {
        single = key;
        ++done.told;
        return 0;
    }
    auto const mode = [&] {
        bool const set2 = (key.flags & KFS_KeyFlag_TangentsSet) != KFS_KeyFlag_TangentsSet && IsAuto() && set.spatial;
        return (!tangentsGiven && key.HasSpline() ? 1 : 0) + (set2 ? 2 : 0);
    };
    bool const open = key.in == 0 || key.out == 0;
    bool const readsDerived = !valueGiven || (set.spatial && !tangentsGiven && (key.HasSpline() || open));
    if (readsDerived) Update();
    int position = Find(key.time);
    if (position >= 0) {
        if (!overwrite) {
            done = Refuse(KFS_Err_KeyValue, 38, Overwrite);
            Mark(position + 1, 2);
            return -1;
        }
        Key& old = At(position);
        if (key.in == 0) key.in = old.in;
        if (key.out == 0) key.out = old.out;
        if (set.spatial) MarkArcs(position + 2, 4);
        if (!valueGiven) key.value = old.value;
        if (mode() != 0) SetDefaultTangents(key.time, mode(), key);
        At(position) = key;
        Mark(position + 1, 2);
    } else {
        if (open) {
            int in, out;
            unsigned int flags, spFlags;
            Choose(key.time, in, out, flags, spFlags);
            if (key.in == 0) key.in = in != 0 ? in : KFS_Interp_Linear;
            if (key.out == 0) key.out = out != 0 ? out : KFS_Interp_Linear;
            constexpr unsigned int taken = KFS_KeyFlag_Continuous | KFS_KeyFlag_Modifiable;
            key.flags = (key.flags & ~taken) | (flags & taken);
            if (set.spatial) key.spFlags = spFlags & 3;
        }
        if (!keys.empty() && !valueGiven)
            Subdivide(key.time, mode(), key, true);
        else if (!keys.empty() && mode() != 0)
            SetDefaultTangents(key.time, mode(), key);
        position = LowerBound(key.time);
        keys.insert(keys.begin() + position, key);
        ShiftUp(stale, position);
        ShiftUp(arcStale, position);
        Mark(position + 1, 2);
        MarkArcs(position + 2, 4);
    }
    ++done.told;
    return position;
}

Done Leaf::InsertKey(int time, bool replace, Numbers const* value, int in, int out)
{
    if (int const found = set.constant ? -1 : Find(time); found >= 0)
        return replace ? SetKey(found, value, in, out) : Refuse(KFS_Err_KeyValue, 17, Overwrite);
    Done done;
    if (!CanDo(in, done) || !CanDo(out, done)) return done;
    if (set.constant && single && !replace) return Refuse(KFS_Err_KeyValue, 17, Overwrite);
    Key key = EmptyKey(time, in, out);
    if (value) key.value = *value;
    InsertFromCache(key, replace, value != nullptr, false, done);
    return done;
}

Done Leaf::InsertKeys(std::vector<Key> const& batch, bool replace, bool values, bool handles)
{
    Leaf const before = *this;
    Done all{0, {}, batch.empty() ? 0 : 1};
    for (Key const& key : batch) {
        Done done = InsertKey(key.time, replace, values ? &key.value : nullptr, key.in, key.out);
        int const index = set.constant ? 0 : Find(key.time);
        if (done.code == 0 && handles) done = SetKeyVelocity(index, &key.inSpeed, &key.outSpeed);
        if (done.code == 0 && handles) done = SetKeyInfluence(index, &key.inInfluence, &key.outInfluence);
        all.reports.insert(all.reports.end(), done.reports.begin(), done.reports.end());
        if (done.code == 0) continue;
        *this = before;
        return {done.code, all.reports, 0};
    }
    return all;
}

Done Leaf::SetKey(int index, Numbers const* value, int in, int out)
{
    Done done;
    if (!CanDo(in, done) || !CanDo(out, done)) return done;
    if (Done const done = Check(index, 27, Alter); done.code != 0) return done;
    Key& key = set.constant ? *single : At(index);
    if (in != 0) key.in = in;
    if (out != 0) key.out = out;
    if (!key.HasSpline()) key.flags &= ~unsigned{KFS_KeyFlag_Continuous};
    if (value) key.value = *value;
    Mark(index + 1, 3);
    if (set.spatial) MarkArcs(index + 2, 4);
    return {0, {}, 1};
}

void Leaf::TakeOut(int index)
{
    keys.erase(keys.begin() + index);
    Mark(index, 1);
    if (set.spatial) MarkArcs(index + 2, 4);
    PullIn(stale, Count());
    PullIn(arcStale, Count());
}

Done Leaf::RemoveKey(int index, Numbers* value)
{
    if (Done const done = Check(index, 18, "remove a key value from"); done.code != 0) return done;
    if (value) *value = set.constant ? single->value : At(index).value;
    if (set.constant)
        single.reset();
    else
        TakeOut(index);
    return {0, {}, 1};
}

Done Leaf::CopyKey(Leaf& source, int index, bool replace, int const* time, int* newIndex)
{
    *newIndex = KFS_INVALID_INDEX;
    if (source.HasNoValue()) return NoKeys(19, "copy a key value from");
    if (!source.set.constant) source.Update();
    if (source.IsBadIndex(index)) return {SEQ_Err_BadIndex, {}, 0};
    Key key = source.set.constant ? *source.single : source.At(index);
    std::optional<int> const own = Rescaled(source.set.constant ? 0 : key.time, source.set.scale, set.scale);
    if (set.constant && single && !replace) return Refuse(KFS_Err_KeyValue, 17, Overwrite);
    if (set.constant && this == &source) {
        single->time = time ? *time : 0;
        if (set.interpMask == 4) single->in = single->out = KFS_Interp_Hold;
        *newIndex = 0;
        return {0, {}, 1};
    }
    key.time = time ? *time : *own;
    if (set.interpMask == 4) key.in = key.out = KFS_Interp_Hold;
    Done done;
    int const position = InsertFromCache(key, replace, true, true, done);
    *newIndex = position >= 0 ? position : KFS_INVALID_INDEX;
    return done;
}

Done Leaf::CopyKeys(Leaf& source)
{
    if (source.HasNoValue()) return NoKeys(21, "copy a key value from");
    if (source.set.constant) {
        Key const from = *source.single;
        return InsertKey(0, true, &from.value, from.in, from.out);
    }
    if (set.constant) return Refuse(KFS_Err_Constant, 21, "attempt to copy a key value to a constant time stream.");
    source.Update();
    Done done;
    std::vector<Key> const copied = source.keys;
    for (Key const& from : copied) {
        Key key = from;
        key.time = *Rescaled(from.time, source.set.scale, set.scale);
        int const position = InsertFromCache(key, true, true, true, done);
        if (!source.set.spatial) continue;
        // The path's half arrives as it is, whatever the insertion made of it.
        Key& to = At(position);
        to.spFlags = from.spFlags;
        to.arc = from.arc;
        to.inSpeed = from.inSpeed;
        to.inInfluence = from.inInfluence;
        to.outSpeed = from.outSpeed;
        to.outInfluence = from.outInfluence;
    }
    return done;
}

Done Leaf::SetKeyTime(int index, int time, int* newIndex, int* oldTime)
{
    if (HasNoValue()) return NoKeys(33, Alter);
    Numbers const sixths(static_cast<std::size_t>(set.dimension), Sixth);
    Done done;
    int const last = Count() - 1;
    if (index == 0) done.told += SetKeyInfluence(0, &sixths, nullptr).told;
    if (!set.constant && index == last) done.told += SetKeyInfluence(index, nullptr, &sixths).told;
    if (set.constant) {
        *oldTime = std::exchange(single->time, time);
        ++done.told;
        return done;
    }
    *oldTime = *newIndex = KFS_INVALID_INDEX;
    if (IsBadIndex(index)) return {SEQ_Err_BadIndex, {}, done.told};
    Around around = NeighboursOf(index, false);
    int low = around.prev >= 0 ? around.prev : index;
    int high = around.next >= 0 ? around.next : index;
    // Float keys make way, one tick apart behind an anchor or ahead of one.
    auto const pack = [&](int anchor, int first, int end) {
        for (int j = first; set.spatial && j < end; ++j)
            if (At(j).Has(KFS_KeyFlag_Float)) At(j).time = At(anchor).time + (j - anchor);
    };
    bool const inside =
        (around.prev >= 0 && time > At(around.prev).time) || (around.next >= 0 && time < At(around.next).time);
    if (inside) {
        if (around.prev >= 0) pack(around.prev, around.prev + 1, index);
        if (around.next >= 0) pack(around.next, index + 1, around.next);
    } else {
        around = Neighbours(time, false);
        auto const packBetween = [&](int prev, int next) {
            pack(time <= At(index).time ? prev : next, prev + 1, next);
        };
        if (around.prev >= 0 && around.next >= 0) {
            // An anchor that stands there is about to be replaced, and keeps its float keys until then.
            bool const replaces = around.at >= 0 && !At(around.at).Has(KFS_KeyFlag_Float);
            packBetween(around.prev, replaces ? around.at : around.next);
            if (replaces) packBetween(around.at, around.next);
        }
        if (around.prev >= 0) low = std::min(low, around.prev);
        if (around.next >= 0) high = std::max(high, around.next);
    }
    *oldTime = At(index).time;
    *newIndex = index;
    if (At(index).time != time) {
        Key key = At(index);
        TakeOut(index);
        ++done.told;
        key.time = time;
        *newIndex = InsertFromCache(key, true, true, true, done);
    }
    Mark(high + 1, high - low + 2);
    MarkArcs(high + 1, high - low + 2);
    ++done.told;
    return done;
}

Done Leaf::Rescale(unsigned int scale)
{
    if (scale == set.scale) return {};
    Done done;
    int prevOld = KFS_INVALID_INDEX, prevNew = KFS_INVALID_INDEX;
    for (int i = 0; !set.constant && i < Count();) {
        int const old = At(i).time;
        int const now = *Rescaled(old, set.scale, scale);
        At(i).time = now;
        int next = i + 1;
        if (now == prevNew && i > 0) {
            auto const distance = [&](int from) {
                return std::fabs(static_cast<long double>(from) / set.scale - static_cast<long double>(now) / scale);
            };
            TakeOut(distance(prevOld) <= distance(old) + 1e-15L ? i : i - 1);
            ++done.told;
            next = i;
        }
        prevOld = old;
        prevNew = now;
        i = next;
    }
    set.scale = scale;
    return done;
}

Done Leaf::SetConstant(bool constant, bool keepValue)
{
    if (constant == set.constant) return {};
    Done done;
    set.constant = constant;
    if (constant) {
        keys.clear();
        stale = arcStale = {};
    } else {
        std::optional<Key> first;
        first.swap(single);
        if (keepValue && first) {
            if (set.spatial) first->flags &= ~unsigned{KFS_KeyFlag_TangentsSet};
            InsertFromCache(*first, false, true, false, done);
        }
    }
    ++done.told;
    return done;
}

Done Leaf::PrepareSetValue(int time)
{
    if (set.constant) return {};
    int index = KFS_INVALID_INDEX;
    if (!keys.empty()) TimeToIndex(time, index);
    return index != KFS_INVALID_INDEX ? Done{} : InsertKey(time, true, nullptr, 0, 0);
}

// ---- the stream as a whole

Done Leaf::Swap(Leaf& other)
{
    std::swap(*this, other);
    std::swap(set.interpMask, other.set.interpMask);  // stays at its place
    return {0, {}, 1};
}

// A clone is this leaf with all of it stale.
Done Leaf::SwapWithClone()
{
    stale = arcStale = keys.empty() ? Range{} : Range{0, Count() - 1};
    return {0, {}, 1};
}

Done Leaf::SetSParametrize(bool on)
{
    if (!set.spatial) return Refuse(KFS_Err_NotSpatial, 50, "stream isn#{rsquo}t spatial");
    if (on != set.sParametrize) {
        MarkArcs(-1, Count());
        Mark(-1, Count());
    }
    set.sParametrize = on;
    return {0, {}, 1};
}

Done Leaf::SetMultiplier(Numbers const& multiplier)
{
    if (!set.spatial) return Refuse(KFS_Err_NotSpatial, 102, "attempt to set multiplier of a non-spatial stream.");
    for (std::size_t i = 0; i < multiplier.size(); ++i) set.multiplier[i & 3] = multiplier[i];
    Mark(-1, Count());
    MarkArcs(-1, Count());
    return {0, {}, 1};
}

Done Leaf::SetSpInterp(int spInterp)
{
    set.spInterp = spInterp;
    return {};
}

Done Leaf::DisposeRemapTables()
{
    if (set.spatial && !set.constant && !keys.empty()) arcStale = {0, Count() - 1};
    return {};
}

Done Leaf::SetAccuracy(double accuracy, double& old)
{
    old = std::sqrt(std::exchange(set.accuracy, accuracy * accuracy));
    return {};
}

// ---- flags

Done Leaf::SetKeyFlags(int index, unsigned int mask, unsigned int value)
{
    if (HasNoValue()) return NoKeys(72, Inquire);
    mask &= ~unsigned{KFS_KeyFlag_SpatialBlock};  // how a record is laid out isn't for callers to say
    if (set.constant) {
        single->flags = (single->flags & ~mask) | (value & mask);
        return {0, {}, 1};
    }
    if (IsBadIndex(index)) return {SEQ_Err_BadIndex, {}, 0};
    Done done;
    bool const turnsFloat = set.spatial && ((At(index).flags ^ value) & mask & KFS_KeyFlag_Float) != 0;
    if (turnsFloat && At(index).Has(KFS_KeyFlag_Float)) Update();
    if ((mask & (KFS_KeyFlag_Continuous | KFS_KeyFlag_Modifiable | KFS_KeyFlag_Float)) != 0) {
        if (turnsFloat) {
            if (At(index).Has(KFS_KeyFlag_Float))
                Subdivide(At(index).time, 1, At(index), false);
            else if (index == 0 || index == Count() - 1)
                value &= ~unsigned{KFS_KeyFlag_Float};
            Mark(index + 1, 2);
            MarkArcs(index + 1, 2);
        } else if (((At(index).flags ^ value) & mask) != 0) {
            Mark(index + 1, 2);
        }
    }
    At(index).flags = (At(index).flags & ~mask) | (value & mask);
    if ((value & mask & KFS_KeyFlag_Continuous) != 0 && index != 0) {
        Numbers in(At(index).inSpeed.size(), 0.0), none;
        Numbers velocity(static_cast<std::size_t>(set.dimension), 0.0);
        Done const got = GetKeyVelocity(index, false, velocity, none);
        done.code = got.code;
        if (got.code == 0) done.told += SetKeyVelocity(index, nullptr, &velocity).told;
    }
    if (done.code == 0) ++done.told;
    return done;
}

// ---- temporal handles

Done Leaf::SetKeyTangents(int index, Numbers const* inX, Numbers const* inY, Numbers const* outX, Numbers const* outY,
                          double yScale)
{
    if (HasNoValue()) return NoKeys(30, Get);
    if (set.constant) return {0, {}, 1};
    if (IsBadIndex(index)) return {SEQ_Err_BadIndex, {}, 0};
    Key& key = At(index);
    Around const around = NeighboursOf(index, false);
    double const dtPrev = around.prev >= 0 ? Seconds(key.time, At(around.prev).time) : 0.0;
    double const dtNext = around.next >= 0 ? Seconds(At(around.next).time, key.time) : 0.0;
    bool const in = inX && inY && around.prev >= 0;
    bool const out = outX && outY && around.next >= 0;
    bool const continuous = key.Has(KFS_KeyFlag_Continuous);
    auto const reduce = [&](double x, double y, double dt, double& speed, double& influence) {
        speed = x != 0.0 ? y / x : 0.0;
        influence = std::fabs(x / dt);
        if (!set.spatial) influence = std::clamp(influence, 0.0001, 1.0);
        if (set.spatial && set.nonDecreasing && speed < 0.0) speed = 0.0;
    };
    auto const follow = [&](double speed, double dt, double& other, double& influence) {
        if (!set.spatial) {
            double const x = influence * dt, y = other * yScale, s = speed * yScale;
            if (std::fabs(s * s + 1.0) < 1e-12 || std::fabs(dt) < 1e-12)
                influence = x;
            else
                influence = std::clamp(std::sqrt((y * y + 1.0) * (x * x) / (s * s + 1.0)) / dt, 0.0001, 1.0);
        }
        other = speed;
    };
    for (std::size_t i = 0; i < key.inSpeed.size(); ++i) {
        if (in) {
            reduce(std::min((*inX)[i], 0.0), (*inY)[i], dtPrev, key.inSpeed[i], key.inInfluence[i]);
            if (continuous && !(outX && outY)) follow(key.inSpeed[i], dtNext, key.outSpeed[i], key.outInfluence[i]);
        }
        if (out) {
            reduce(std::max((*outX)[i], 0.0), (*outY)[i], dtNext, key.outSpeed[i], key.outInfluence[i]);
            if (continuous && !(inX && inY)) follow(key.outSpeed[i], dtPrev, key.inSpeed[i], key.inInfluence[i]);
        }
    }
    if (in) continuous && !(outX && outY) ? Mark(index + 1, 2) : Mark(index, 1);
    if (out) continuous && !(inX && inY) ? Mark(index + 1, 2) : Mark(index + 1, 1);
    return {0, {}, 1};
}

Done Leaf::GetKeyTangents(int index, Numbers& inX, Numbers& inY, Numbers& outX, Numbers& outY)
{
    if (Done const done = Check(index, 30, Get); done.code != 0) return done;
    UpdateIfStale(index);
    Key const& key = set.constant ? *single : At(index);
    Around const around = set.constant ? Around{} : NeighboursOf(index, false);
    double const dtPrev = around.prev >= 0 ? Seconds(key.time, At(around.prev).time) : 0.0;
    double const dtNext = around.next >= 0 ? Seconds(At(around.next).time, key.time) : 0.0;
    for (std::size_t i = 0; i < key.inSpeed.size(); ++i) {
        inX[i] = set.constant ? 0.0 : -key.inInfluence[i] * dtPrev;
        inY[i] = set.constant ? 0.0 : key.inSpeed[i] * inX[i];
        outX[i] = set.constant ? 0.0 : key.outInfluence[i] * dtNext;
        outY[i] = set.constant ? 0.0 : key.outSpeed[i] * outX[i];
    }
    return {};
}

Done Leaf::SetKeyVelocity(int index, Numbers const* in, Numbers const* out)
{
    if (HasNoValue()) return NoKeys(51, Inquire);
    if (set.constant) return {0, {}, 1};
    if (IsBadIndex(index)) return {SEQ_Err_BadIndex, {}, 0};
    Key& key = At(index);
    bool const continuous = key.Has(KFS_KeyFlag_Continuous);
    for (std::size_t i = 0; i < key.inSpeed.size(); ++i) {
        auto const legal = [&](double speed) { return set.nonDecreasing && speed < 0.0 && set.spatial ? 0.0 : speed; };
        if (in) key.inSpeed[i] = legal((*in)[i]);
        if (out) key.outSpeed[i] = legal((*out)[i]);
        if (continuous && in && !out) key.outSpeed[i] = key.inSpeed[i];
        if (continuous && out && !in) key.inSpeed[i] = key.outSpeed[i];
    }
    if (set.spatial && (in || continuous)) Mark(index, 1);
    if (set.spatial && (out || continuous)) Mark(index + 1, 1);
    key.flags &= ~unsigned{KFS_KeyFlag_Modifiable};
    return {0, {}, 1};
}

Done Leaf::GetKeyVelocity(int index, bool zeroAtEnds, Numbers& in, Numbers& out)
{
    if (HasNoValue()) return NoKeys(52, Get);
    set.spatial ? Update() : UpdateIfStale(index);  // straight runs are measured
    if (IsBadIndex(index)) return {SEQ_Err_BadIndex, {}, 0};
    int const last = Count() - 1;
    auto const give = [](Numbers& to, Numbers const& from) {
        std::copy_n(from.begin(), std::min(to.size(), from.size()), to.begin());
        if (!to.empty() && std::fabs(to[0]) < 1e-10) to[0] = 0.0;
    };
    if (set.constant) {
        Numbers const rest(single->inSpeed.size(), 0.0);
        give(in, rest);
        give(out, rest);
        return {};
    }
    Key const& key = At(index);
    Around const around = NeighboursOf(index, false);
    for (bool const isIn : {true, false}) {
        Numbers& to = isIn ? in : out;
        if (to.empty()) continue;
        int const facing = isIn ? around.prev : around.next;
        int const code = isIn ? key.in : key.out;
        bool const end = isIn ? index == 0 : index == last;
        bool const rests =
            code == KFS_Interp_Hold || (facing >= 0 && (isIn ? At(facing).out : At(facing).in) == KFS_Interp_Hold);
        Numbers const& speed = isIn ? key.inSpeed : key.outSpeed;
        Numbers const& influence = isIn ? key.inInfluence : key.outInfluence;
        Numbers answer = to;
        if (set.spatial) {
            answer.resize(1);
            if ((end && zeroAtEnds) || rests) {
                answer[0] = 0.0;
            } else if (code == KFS_Interp_Spline) {
                answer[0] = influence[0] == 0.0 ? 0.0 : speed[0];
            } else if (code == KFS_Interp_Linear && !end) {
                bool const whole = Floats(index);
                int const from = isIn || whole ? around.prev : index;
                int const until = isIn && !whole ? index : around.next;
                double const seconds = Seconds(At(until).time, At(from).time);
                if (std::fabs(seconds) < 1e-12) return {3, {}, 0};
                answer[0] = ArcsFrom(from, until) / seconds;
            }
        } else {
            answer = speed;
            if (end || rests) {
                answer.assign(answer.size(), 0.0);
            } else if (code == KFS_Interp_Linear) {
                Key const& a = At(isIn ? index - 1 : index);
                Key const& b = At(isIn ? index : index + 1);
                for (std::size_t i = 0; i < answer.size(); ++i)
                    answer[i] = (b.value[i] - a.value[i]) / Seconds(b.time, a.time);
            }
        }
        give(to, answer);
    }
    return {};
}

Done Leaf::SetKeyInfluence(int index, Numbers const* in, Numbers const* out)
{
    if (HasNoValue()) return NoKeys(53, Inquire);
    if (set.constant) return {0, {}, 1};
    if (IsBadIndex(index)) return {SEQ_Err_BadIndex, {}, 0};
    Key& key = At(index);
    for (std::size_t i = 0; i < key.inInfluence.size(); ++i) {
        if (in) key.inInfluence[i] = std::clamp((*in)[i], 0.0, 1.0);
        if (out) key.outInfluence[i] = std::clamp((*out)[i], 0.0, 1.0);
    }
    if (set.spatial && in) Mark(index, 1);
    if (set.spatial && out) Mark(index + 1, 1);
    key.flags &= ~unsigned{KFS_KeyFlag_Modifiable};
    return {0, {}, 1};
}

Done Leaf::GetKeyInfluence(int index, Numbers& in, Numbers& out)
{
    if (Done const done = Check(index, 54, Get); done.code != 0) return done;
    UpdateIfStale(index);
    Key& key = set.constant ? *single : At(index);
    for (std::size_t i = 0; i < key.inInfluence.size(); ++i) {
        // A constant's record is where the answer is put together.
        if (set.constant && !set.spatial && key.in != KFS_Interp_Spline) key.inInfluence[i] = Sixth;
        if (set.constant && !set.spatial && key.out != KFS_Interp_Spline) key.outInfluence[i] = Sixth;
        in[i] = key.in == KFS_Interp_Spline ? key.inInfluence[i] : Sixth;
        out[i] = key.out == KFS_Interp_Spline ? key.outInfluence[i] : Sixth;
    }
    return {};
}

Done Leaf::GetClamped(int index, Numbers& inVelocity, Numbers& inInfluence, Numbers& outVelocity, Numbers& outInfluence,
                      bool& clamped)
{
    if (Done const done = Check(index, 101, Get); done.code != 0) return done;
    UpdateIfStale(index);
    if (set.constant) return {};
    Key const& key = At(index);
    for (int const side : {-1, 1}) {
        int const other = index + side;
        if (other < 0 || other >= Count()) continue;
        double const dt = std::fabs(Seconds(key.time, At(other).time));
        for (std::size_t i = 0; i < key.value.size(); ++i) {
            double& v = (side < 0 ? inVelocity : outVelocity)[i];
            double& f = (side < 0 ? inInfluence : outInfluence)[i];
            double const c = key.value[i], p = At(other).value[i];
            double const toward = side * v;  // the way that the handle goes, away from the key
            if ((p > c && toward < 0.0) || (c > p && toward > 0.0)) {
                v = 0.0;
                clamped = true;
                continue;
            }
            double const h = c + f * dt * toward;
            if (v == 0.0 || (h >= std::min(p, c) && h <= std::max(p, c))) continue;
            // Cut where the handle reaches the neighbour's value: its direction stays.
            double const x = (std::clamp(h, std::min(p, c), std::max(p, c)) - c) / v;
            if (x == 0.0) v = 0.0;
            f = std::fabs(x / dt);
            clamped = true;
        }
    }
    return {};
}

// ---- spatial tangents

namespace {

Done NotSpatial(int operation)
{
    return {KFS_Err_NotSpatial,
            {KfsReport(operation, "attempt to inquire spatial tangents from a non-spatial stream.")},
            0};
}

}  // namespace

Done Leaf::SetKeySpaceTangents(int index, Numbers const* in, Numbers const* out)
{
    if (!set.spatial) return NotSpatial(31);
    if (set.constant && !single) return NoKeys(72, Inquire);  // a record's flags are asked for
    if (Done const done = Check(index, 31, Alter); done.code != 0) return done;
    Key& key = set.constant ? *single : At(index);
    Numbers const* const given = in ? in : out;
    bool const mirrors = (key.spFlags & KFS_KeySpFlag_Continuous) != 0 && (in == nullptr) != (out == nullptr);
    if (mirrors && !IsZero(*given)) {
        Numbers& other = in ? key.outTangent : key.inTangent;
        double const length = std::sqrt(Square(other));
        double const scale = 1.0 / std::sqrt(Square(*given));
        for (std::size_t i = 0; i < other.size(); ++i) other[i] = -(*given)[i] * scale * length;
    }
    if (in) key.inTangent = *in;
    if (out) key.outTangent = *out;
    key.flags |= KFS_KeyFlag_TangentsSet;
    key.spFlags &= ~unsigned{KFS_KeySpFlag_Modifiable};
    MarkArcs(index + 1, 2);
    Mark(index + 1, 2);
    return {0, {}, 1};
}

Done Leaf::GetKeySpaceTangents(int index, Numbers& in, Numbers& out)
{
    if (!set.spatial) return NotSpatial(32);
    if (HasNoValue()) return NoKeys(32, Get);
    if (!set.constant) Update();
    if (IsBadIndex(index)) return {SEQ_Err_BadIndex, {}, 0};
    Key const& key = set.constant ? *single : At(index);
    in = key.inTangent;
    out = key.outTangent;
    return {};
}

Done Leaf::AlterSpFlags(int index, unsigned int set2, unsigned int clear)
{
    if (Done const done = Check(index, 72, Inquire); done.code != 0) return done;
    Key& key = set.constant ? *single : At(index);
    key.spFlags = (key.spFlags & ~clear) | set2;
    return {};
}

Done Leaf::SetKeySpFlags(int index, unsigned int mask, unsigned int values)
{
    if (HasNoValue()) return NoKeys(76, Inquire);
    Done done = AlterSpFlags(index, values & mask, mask);
    bool const marks =
        (mask & KFS_KeySpFlag_Modifiable) != 0 || ((mask & KFS_KeySpFlag_Continuous) != 0 && done.code == 0);
    if (!set.constant && marks) {
        MarkArcs(index + 1, 2);
        done.code = 0;  // the mark's result
    }
    return done;
}

Done Leaf::SetKeySpModifiable(bool on, int index)
{
    constexpr unsigned int flag = KFS_KeySpFlag_Modifiable;
    Done const done = AlterSpFlags(index, on ? flag : 0U, flag);
    if (on && done.code == 0) MarkArcs(index + 1, 2);
    return done;
}

Done Leaf::SetKeySpContinuous(bool on, int index)
{
    constexpr unsigned int flag = KFS_KeySpFlag_Continuous;
    return AlterSpFlags(index, on ? flag : 0U, flag);
}

// ---- lookups

Done Leaf::GetKey(int index, Numbers& value, int& in, int& out)
{
    if (Done const done = Check(index, 28, Get); done.code != 0) return done;
    Key const& key = set.constant ? *single : At(index);
    value = key.value;
    in = key.in;
    out = key.out;
    return {};
}

Done Leaf::GetFlags(int index, unsigned int& flags)
{
    if (Done const done = Check(index, 72, Inquire); done.code != 0) return done;
    flags = set.constant ? single->flags : At(index).flags;
    return {};
}

Done Leaf::GetSpFlags(int index, unsigned int& flags)
{
    Done const done = GetFlags(index, flags);  // which is what a constant answers
    if (done.code == 0 && !set.constant) flags = At(index).spFlags;
    return done;
}

Done Leaf::FindKeyTime(int time, bool backward, bool atTime, bool& found, int& index, T_Time& keyTime)
{
    found = false;
    index = KFS_INVALID_INDEX;
    keyTime = {KFS_INVALID_INDEX, 0};
    if (set.constant) return Refuse(KFS_Err_Constant, 22, "attempt to get a key value from a constant time stream.");
    for (int i = backward ? Count() - 1 : 0; i >= 0 && i < Count(); i += backward ? -1 : 1) {
        bool const beyond = backward ? At(i).time < time : At(i).time > time;
        if (!beyond && !(atTime && At(i).time == time)) continue;
        found = true;
        index = i;
        keyTime = {At(i).time, set.scale};
        break;
    }
    return {};
}

Done Leaf::FindNearest(int time, int& index, T_Time& keyTime)
{
    index = KFS_INVALID_INDEX;
    keyTime = {KFS_INVALID_INDEX, 0};
    if (set.constant) {
        if (!single) return NoKeys(23, Get);
        single->time = time;
        index = 0;
        keyTime = {time, set.scale};
        return {};
    }
    keyTime.scale = set.scale;
    for (int i = 0; i < Count(); ++i)
        if (index == KFS_INVALID_INDEX || std::abs(At(i).time - time) < std::abs(At(index).time - time)) index = i;
    if (index != KFS_INVALID_INDEX) keyTime.value = At(index).time;
    return {};
}

Done Leaf::TimeToIndex(int time, int& index)
{
    index = KFS_INVALID_INDEX;
    if (set.constant)
        return Refuse(KFS_Err_Constant, 24, "attempt to inquire about a key value in a constant time stream.");
    if (keys.empty()) return NoKeys(24, Inquire);
    int found = Find(time);
    if (found < 0 || !At(found).Has(KFS_KeyFlag_Float)) {
        Update();
        found = Find(time);
    }
    if (found >= 0) index = found;
    return {};
}

Done Leaf::GetKeyIndex(int time, int& index, bool& found)
{
    index = KFS_INVALID_INDEX;
    found = false;
    if (HasNoValue()) return NoKeys(26, Get);
    if (set.constant) {
        single->time = time;
        index = 0;
        found = true;
        return {};
    }
    for (int i = 0; i < Count() && At(i).time <= time; ++i) {
        index = i;
        found = At(i).time == time;
    }
    return {};
}

Done Leaf::IndexToTime(int index, T_Time& time)
{
    time = {KFS_INVALID_INDEX, 0};
    if (set.constant) {
        if (!single)
            return Refuse(KFS_Err_Constant, 25, "attempt to inquire about a key value in a constant time stream.");
        time = {single->time, set.scale};
        return {};
    }
    if (index == -1) index = Count() - 1;
    if (index < 0 || index >= Count()) return {};
    if (At(index).Has(KFS_KeyFlag_Float) && arcStale.Holds(index)) Update();
    time = {At(index).time, set.scale};
    return {};
}

Done Leaf::ForRange(int const* first, int const* last, std::vector<int>& times)
{
    if (HasNoValue()) return NoKeys(34, "iterate over");
    if (set.constant) {
        times.push_back(single->time);
        return {};
    }
    Update();
    bool const reversed = first && last && *first > *last;
    int const low = reversed ? *last : first ? *first : INT_MIN;
    int const high = reversed ? *first : last ? *last : INT_MAX;
    for (Key const& key : keys)
        if (key.time >= low && key.time <= high) times.push_back(key.time);
    if (reversed) std::reverse(times.begin(), times.end());
    return {};
}

Done Leaf::PredictInvalid(int action, int time, int& from, int& to)
{
    from = to = time;
    if ((action == 5 || action == 6) && !set.spatial)
        return Refuse(KFS_Err_NotSpatial, 77, "attempt to predict spatial change of a non-spatial stream.");
    if (set.constant || keys.empty()) return {};
    if (set.spatial) Update();
    Around const around = Neighbours(time, false);
    if (action < 1 || action > 6) return {};
    int first = -1, last = -1;
    if (action <= 2) {
        auto const isAuto = [&](Key const& key, int code) {
            return (code == KFS_Interp_Spline && key.Has(KFS_KeyFlag_Modifiable)) ||
                   (set.spatial && (key.spFlags & KFS_KeySpFlag_Modifiable) != 0);
        };
        first = around.prev;
        last = around.next;
        if (first > 0 && isAuto(At(first), At(first).in)) first = NeighboursOf(first, set.spatial).prev;
        if (last >= 0 && last < Count() - 1 && isAuto(At(last), At(last).out))
            last = NeighboursOf(last, set.spatial).next;
    } else {
        if (around.at < 0)
            return {KFS_Err_NoControlPoint, {KfsReport(77, "no control point corresponding to passed time value.")}, 0};
        Key const& key = At(around.at);
        bool const continuous =
            set.spatial ? (key.spFlags & KFS_KeySpFlag_Continuous) != 0 : key.Has(KFS_KeyFlag_Continuous);
        bool const in = action == 3 || action == 5;
        if (in || continuous) first = around.prev;
        if (!in || continuous) last = around.next;
    }
    if (first >= 0) from = At(first).time;
    if (last >= 0) to = At(last).time;
    return {};
}

}  // namespace leafmodel
