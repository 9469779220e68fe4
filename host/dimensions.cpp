// The moves between a leader and its followers: what is asked for, what is compared, and the exchange at the end.
#include "host/dimensions.h"

#include "host/componentkeys_private.h"
#include "host/scene.h"
#include "host/storeerror.h"
#include "keystore/attributes.h"
#include "keystore/edit.h"
#include "keystore/evaluate.h"
#include "keystore/keyflags.h"
#include "keystore/lookup.h"
#include "keystore/separation.h"
#include "tree/streamgroup.h"

#include <fmt/format.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <map>
#include <set>

namespace kfshost {

namespace {

using Leaf = std::unique_ptr<KFS_Stream>;

// What is thrown inside as a code comes out as a StoreError.
template <class Work>
auto Told(Work const& work)
{
    try {
        return work();
    } catch (int code) {
        throw StoreError(code);
    }
}

// A stream of the same class and form, with neither keys nor a value yet.
Leaf EmptyClone(KFS_Stream const& stream, unsigned int timeScale, bool constant)
{
    Leaf clone(stream.CloneLeaf({false, false}));
    ThrowIfFailed(clone->SetConstant(1, 0));
    if (clone->GetTimeScale() != timeScale) ThrowIfFailed(KFS_RescaleStream(clone.get(), timeScale));
    if (!constant) ThrowIfFailed(clone->SetConstant(0, 0));
    return clone;
}

void PutConstant(KFS_Stream& constant, double const* value)
{
    T_Time const start{0, constant.GetTimeScale()};
    ThrowIfFailed(KFS_InsertKeyF(&constant, &start, 1, value, 0, 0));
}

void ReadUnits(KFS_Stream const& stream, int time, double* values)
{
    T_Time const at{time, stream.GetTimeScale()};
    ThrowIfFailed(KFS_GetValueFPlus(&stream, &at, KFS_EvalFlag_NoExpression, values, nullptr, nullptr));
}

// A value that comes from one stream, or a component from each of several.
class Source {
public:
    explicit Source(KFS_Stream const& whole) : streams_{&whole} {}
    explicit Source(std::vector<KFS_Stream const*> components) : streams_(std::move(components)) {}

    void Read(int time, std::vector<double>& row) const
    {
        if (streams_.size() == 1) {
            ReadUnits(*streams_.front(), time, row.data());
            return;
        }
        for (std::size_t d = 0; d < streams_.size(); ++d) ReadUnits(*streams_[d], time, &row[d]);
    }

private:
    std::vector<KFS_Stream const*> streams_;
};

// Compares two forms of a curve between keys at these times, which ascend.
void Compare(Source const& before, Source const& after, std::set<int> const& times, KFS_Stream const& leader,
             MoveNotes& notes)
{
    auto const dimension = static_cast<std::size_t>(leader.GetDimension());
    std::vector<double> was(dimension);
    std::vector<double> is(dimension);
    auto const compareAt = [&](int time) {
        before.Read(time, was);
        after.Read(time, is);
        for (std::size_t d = 0; d < dimension; ++d) {
            notes.greatest = std::max(notes.greatest, std::abs(was[d]));
            double const error = std::abs(is[d] - was[d]);
            if (!(error > notes.worstError)) continue;
            notes.worstError = error;
            notes.worstTime = Rational(time, leader.GetTimeScale());
            notes.worstComponent = static_cast<int>(d);
        }
    };
    constexpr std::int64_t pieces = 16;
    for (auto at = times.begin(); at != times.end(); ++at) {
        compareAt(*at);
        auto const next = std::next(at);
        if (next == times.end()) break;
        std::int64_t const length = std::int64_t{*next} - *at;
        std::int64_t last = 0;
        for (std::int64_t i = 1; i < pieces; ++i) {
            std::int64_t const offset = length * i / pieces;
            if (offset > last) compareAt(static_cast<int>(*at + offset));
            last = offset;
        }
        if (length > 2) {
            compareAt(*at + 1);
            compareAt(*next - 1);
        }
    }
}

std::set<int> TimesOf(ComponentKeys const& keys)
{
    std::set<int> times;
    for (ComponentKey const& key : keys) times.insert(times.end(), key.time);
    return times;
}

void RefuseBeyond(double tolerance, MoveNotes const& notes)
{
    if (notes.worstError <= tolerance) return;
    throw DimensionsError(fmt::format("would be up to {:.3g} off between keys, at {} s, which is more than {:.3g}",
                                      notes.worstError, notes.worstTime.ToString(), tolerance));
}

// Neither side may have one, also where it rests: what moves would replace it.
void RefuseExpression(KFS_Stream const& stream)
{
    if (stream.HasExpression()) throw DimensionsError("has an expression, which has no form on the other side");
}

void CheckLeader(KFS_Stream const& leader)
{
    if (leader.IsSeparationFollower()) throw DimensionsError("is one dimension of a stream, not the whole");
    if (!leader.IsSeparationLeader() || leader.GetValueDesc()->isCustom)
        throw DimensionsError("isn't of a kind whose dimensions can be separated");
    KFS_StreamGroup const* const parent = leader.GetParent();
    if (!parent || !parent->IsNamedGroup()) throw DimensionsError("has no place in a group, where followers would be");
    RefuseExpression(leader);
}

void CheckContent(KFS_Stream const& stream)
{
    bool const hasValue = stream.HasKeys() ? stream.GetKeyCount() > 0 : stream.GetCache()->time != KFS_INVALID_INDEX;
    if (!hasValue) throw DimensionsError("has neither keys nor a value");
}

std::vector<KFS_Stream*> FollowersOf(KFS_Stream& leader)
{
    std::vector<KFS_Stream*> followers;
    leader.GetSeparationFollowers(followers);
    bool const isWhole = followers.size() == static_cast<std::size_t>(leader.GetDimension()) &&
                         std::ranges::all_of(followers, [](KFS_Stream const* follower) {
                             return follower && follower->IsSeparationFollower() && follower->GetDimension() == 1;
                         });
    if (!isWhole) throw DimensionsError("has no followers in its group");
    for (KFS_Stream const* follower : followers) RefuseExpression(*follower);
    return followers;
}

std::vector<KFS_Stream const*> Views(std::vector<Leaf> const& leaves)
{
    std::vector<KFS_Stream const*> views;
    for (Leaf const& leaf : leaves) views.push_back(leaf.get());
    return views;
}

// ---- separating

// The followers to be.
std::vector<Leaf> MakeFollowers(KFS_Stream const& leader, std::vector<KFS_Stream*> const& places, MoveNotes& notes)
{
    bool const isConstant = leader.HasNoKeys();
    std::vector<Leaf> followers;
    for (KFS_Stream const* place : places) followers.push_back(EmptyClone(*place, leader.GetTimeScale(), isConstant));
    if (isConstant) {
        std::vector<double> value(followers.size());
        ReadUnits(leader, 0, value.data());
        for (std::size_t d = 0; d < followers.size(); ++d) PutConstant(*followers[d], &value[d]);
        return followers;
    }
    std::vector<ComponentKeys> components;
    if (leader.IsSpatial()) {
        PathKeys path = KeysOfPath(leader);
        components = std::move(path.components);
        notes.bentArcs = path.bentArcs;
        notes.floatKeys = path.floatKeys;
    } else {
        components = KeysOfCurves(leader);
    }
    for (std::size_t d = 0; d < followers.size(); ++d) PutKeys(*followers[d], {&components[d], 1});
    Compare(Source(leader), Source(Views(followers)), TimesOf(components.front()), leader, notes);
    return followers;
}

// ---- joining

// What a component does from one key to the next. A hold on the near side keeps the first value until the second key; a hold
// on the far side alone takes the second value at once.
enum class Motion { Rests, Moves, JumpsAtEnd, JumpsAtStart };

Motion MotionOf(ComponentKey const& a, ComponentKey const& b)
{
    bool const isLinear = a.out.interp == KFS_Interp_Linear && b.in.interp == KFS_Interp_Linear;
    bool const isHeld = a.out.interp == KFS_Interp_Hold || b.in.interp == KFS_Interp_Hold;
    if ((isLinear || isHeld) && a.value == b.value) return Motion::Rests;
    if (!isHeld) return Motion::Moves;
    return a.out.interp == KFS_Interp_Hold ? Motion::JumpsAtEnd : Motion::JumpsAtStart;
}

// A follower on its way into a leader: its curve, cut at times that it has no keys at.
class Part {
public:
    Part(KFS_Stream const& follower, unsigned int timeScale)
    {
        if (follower.HasNoKeys()) {
            ReadUnits(follower, 0, &constant_);
            return;
        }
        stream_.reset(follower.CloneLeaf({true, false}));
        if (stream_->GetTimeScale() != timeScale) ThrowIfFailed(KFS_RescaleStream(stream_.get(), timeScale));
        keys_ = KeysOfCurves(*stream_).front();
    }

    ComponentKeys const& Keys() const { return keys_; }
    bool HasKeyAt(int time) const { return std::ranges::binary_search(keys_, time, {}, &ComponentKey::time); }

    // From one time to another between which no part has a key.
    Motion Between(int from, int to) const
    {
        if (keys_.empty() || to <= keys_.front().time || from >= keys_.back().time) return Motion::Rests;
        ComponentKey const& next = *std::ranges::upper_bound(keys_, from, {}, &ComponentKey::time);
        ComponentKey const& prev = *(&next - 1);
        Motion const motion = MotionOf(prev, next);
        bool const isElsewhere =
            (motion == Motion::JumpsAtEnd && next.time != to) || (motion == Motion::JumpsAtStart && prev.time != from);
        return isElsewhere ? Motion::Rests : motion;
    }

    // The curve with keys at all these times, which are its own and others.
    ComponentKeys CutAt(std::set<int> const& times)
    {
        for (int const time : times)
            if (!keys_.empty() && time > keys_.front().time && time < keys_.back().time) Cut(time);
        ComponentKeys const own = stream_ ? KeysOfCurves(*stream_).front() : ComponentKeys();
        ComponentKeys cut;
        auto next = own.begin();
        for (int const time : times) {
            ComponentKey key{.time = time, .value = constant_, .in = Straight, .out = Straight};
            if (next != own.end() && next->time == time) {
                key = *next++;
                if (time == own.front().time && time != *times.begin()) key.in = Straight;
                if (time == own.back().time && time != *times.rbegin()) key.out = Straight;
            } else if (stream_) {
                ReadUnits(*stream_, time, &key.value);  // beyond its ends
            }
            cut.push_back(key);
        }
        // A cut computes the value anew, and may round it otherwise than a read does.
        for (ComponentKey& key : cut)
            if (auto const value = values_.find(key.time); value != values_.end()) key.value = value->second;
        return cut;
    }

private:
    static constexpr KeySide Straight{KFS_Interp_Linear, 0.0, 0.16666666667};

    // Handles that are automatic would follow the keys that come beside them. They are up to date.
    void Freeze()
    {
        for (std::size_t i = 0; i < keys_.size(); ++i)
            if ((keys_[i].flags & KFS_KeyFlag_Modifiable) != 0)
                ThrowIfFailed(KFS_SetKeyModifiable(stream_.get(), 0, static_cast<int>(i)));
    }

    // Read before anything is cut.
    void Cut(int time)
    {
        auto const next = std::ranges::upper_bound(keys_, time, {}, &ComponentKey::time);
        auto const prev = std::prev(next);
        if (prev->time == time) return;
        if (values_.empty()) {
            uncut_.reset(stream_->CloneLeaf({true, false}));
            Freeze();
        }
        ReadUnits(*uncut_, time, &values_[time]);
        T_Time const at{time, stream_->GetTimeScale()};
        // Left to choose, the key would take what curves on one side of a hold.
        bool const isHeld = prev->out.interp == KFS_Interp_Hold || next->in.interp == KFS_Interp_Hold;
        char const code = isHeld ? KFS_Interp_Hold : KFS_Interp_None;
        ThrowIfFailed(KFS_InsertKeyF(stream_.get(), &at, 0, nullptr, code, code));
    }

    double constant_ = 0.0;
    Leaf stream_;
    Leaf uncut_;
    ComponentKeys keys_;
    std::map<int, double> values_;
};

// Whether one pair of codes serves all: the resting ones go with any.
bool GoTogether(std::vector<Motion> const& motions)
{
    auto const isAllOf = [&](Motion one) {
        return std::ranges::all_of(motions, [one](Motion motion) { return motion == one || motion == Motion::Rests; });
    };
    return isAllOf(Motion::Moves) || isAllOf(Motion::JumpsAtEnd) || isAllOf(Motion::JumpsAtStart);
}

// The times of all keys, and those one unit from the jump of a component beside which another does something else.
std::set<int> JoinedTimes(std::vector<Part> const& parts, MoveNotes& notes)
{
    std::set<int> times;
    for (Part const& part : parts)
        for (ComponentKey const& key : part.Keys()) times.insert(key.time);
    notes.addedKeys = static_cast<std::size_t>(std::ranges::count_if(times, [&](int time) {
        return !std::ranges::all_of(parts,
                                    [time](Part const& part) { return part.Keys().empty() || part.HasKeyAt(time); });
    }));
    std::set<int> jumps;
    std::vector<Motion> motions(parts.size());
    for (auto to = times.begin(); to != times.end(); ++to) {
        if (to == times.begin()) continue;
        int const from = *std::prev(to);
        std::ranges::transform(parts, motions.begin(), [&](Part const& part) { return part.Between(from, *to); });
        if (GoTogether(motions) || std::int64_t{*to} - from < 2) continue;
        if (std::ranges::count(motions, Motion::JumpsAtEnd) > 0) jumps.insert(*to - 1);
        if (std::ranges::count(motions, Motion::JumpsAtStart) > 0) jumps.insert(from + 1);
    }
    notes.heldKeys = jumps.size();
    times.merge(jumps);
    return times;
}

// What a linear side is as a handle.
void Bend(ComponentKey& a, ComponentKey& b, unsigned int timeScale)
{
    double const seconds = (static_cast<double>(b.time) - a.time) / timeScale;
    double const slope = (b.value - a.value) / seconds;
    bool const isLinear = a.out.interp == KFS_Interp_Linear && b.in.interp == KFS_Interp_Linear;
    for (KeySide* const side : {&a.out, &b.in})
        if (side->interp == KFS_Interp_Linear) *side = {KFS_Interp_Spline, slope, isLinear ? 1.0 / 3.0 : 0.16666666667};
}

// Gives all components the same codes on both sides of the segment behind a key.
void MakeAlike(std::vector<ComponentKeys>& components, std::size_t index, unsigned int timeScale)
{
    auto const areAlike = [&] {
        return std::ranges::all_of(components, [&](ComponentKeys const& keys) {
            return keys[index].out.interp == components.front()[index].out.interp &&
                   keys[index + 1].in.interp == components.front()[index + 1].in.interp;
        });
    };
    if (areAlike()) return;
    std::vector<Motion> motions(components.size());
    std::ranges::transform(components, motions.begin(),
                           [&](ComponentKeys const& keys) { return MotionOf(keys[index], keys[index + 1]); });
    bool const anyMoves = std::ranges::count(motions, Motion::Moves) > 0;
    bool const allHold = !anyMoves && GoTogether(motions);
    bool const atStart = std::ranges::count(motions, Motion::JumpsAtStart) > 0;
    // Where a jump is beside something else, there is no time in the segment to see it.
    for (std::size_t d = 0; d < components.size(); ++d) {
        if (!allHold && motions[d] == Motion::Moves) continue;
        components[d][index].out.interp = allHold && !atStart ? KFS_Interp_Hold : KFS_Interp_Linear;
        components[d][index + 1].in.interp = allHold ? KFS_Interp_Hold : KFS_Interp_Linear;
    }
    if (areAlike()) return;
    for (ComponentKeys& keys : components) Bend(keys[index], keys[index + 1], timeScale);
}

// The leader to be.
Leaf MakeLeader(KFS_Stream const& leader, std::vector<KFS_Stream*> const& places, MoveNotes& notes)
{
    std::vector<KFS_Stream const*> const followers(places.begin(), places.end());
    unsigned int const scale = leader.GetTimeScale();
    std::vector<Part> parts;
    for (KFS_Stream const* follower : followers) parts.emplace_back(*follower, scale);
    std::set<int> const times = JoinedTimes(parts, notes);
    Leaf joined = EmptyClone(leader, scale, times.empty());
    std::vector<ComponentKeys> components;
    if (times.empty()) {
        std::vector<double> value(followers.size());
        Source(followers).Read(0, value);
        PutConstant(*joined, value.data());
        return joined;
    }
    for (Part& part : parts) components.push_back(part.CutAt(times));
    for (std::size_t i = 0; i + 1 < times.size(); ++i) MakeAlike(components, i, scale);
    for (ComponentKeys& keys : components) {  // beyond the ends there is nothing to be shaped
        keys.front().in.interp = components.front().front().in.interp;
        keys.back().out.interp = components.front().back().out.interp;
        // A cut ends what is automatic around it.
        if (notes.addedKeys + notes.heldKeys > 0)
            for (ComponentKey& key : keys) key.flags &= static_cast<unsigned short>(~KFS_KeyFlag_Modifiable);
    }
    PutKeys(*joined, components);
    Compare(Source(followers), Source(*joined), times, leader, notes);
    return joined;
}

std::vector<KFS_Stream*> CheckedFollowers(KFS_Stream& leader)
{
    CheckLeader(leader);
    if (!leader.AreDimensionsSeparated()) throw DimensionsError("isn't separated");
    std::vector<KFS_Stream*> followers = FollowersOf(leader);
    for (KFS_Stream const* follower : followers) CheckContent(*follower);
    return followers;
}

// As a follower is that nobody has touched.
Leaf AtRest(KFS_Stream const& follower)
{
    auto const* const typed = dynamic_cast<KFS_SeparationFollowerStream const*>(&follower);
    double const standard = typed ? typed->GetDefaultValue() : 0.0;
    Leaf rest = EmptyClone(follower, follower.GetTimeScale(), true);
    PutConstant(*rest, &standard);
    return rest;
}

}  // namespace

MoveNotes SeparateDimensions(KFS_Stream& leader, double tolerance)
{
    return Told([&] {
        CheckLeader(leader);
        if (leader.AreDimensionsSeparated()) throw DimensionsError("is separated already");
        CheckContent(leader);
        std::vector<KFS_Stream*> const places = FollowersOf(leader);
        MoveNotes notes;
        std::vector<Leaf> const followers = MakeFollowers(leader, places, notes);
        RefuseBeyond(tolerance, notes);
        Leaf const rest = EmptyClone(leader, leader.GetTimeScale(), true);
        std::vector<double> value(places.size());
        ReadUnits(leader, 0, value.data());
        PutConstant(*rest, value.data());
        for (std::size_t d = 0; d < places.size(); ++d) places[d]->swap(*followers[d]);
        leader.swap(*rest);
        for (KFS_Stream* place : places) place->SetHidden(false);
        leader.SetHidden(true);
        leader.SetDimensionsSeparated(true);
        return notes;
    });
}

MoveNotes JoinDimensions(KFS_Stream& leader, double tolerance)
{
    return Told([&] {
        MoveNotes notes;
        std::vector<KFS_Stream*> const places = CheckedFollowers(leader);
        Leaf const joined = MakeLeader(leader, places, notes);
        RefuseBeyond(tolerance, notes);
        std::vector<Leaf> rests;
        for (KFS_Stream const* place : places) rests.push_back(AtRest(*place));
        leader.swap(*joined);
        leader.SetDimensionsSeparated(false);
        leader.SetHidden(false);
        for (std::size_t d = 0; d < places.size(); ++d) {
            places[d]->swap(*rests[d]);
            places[d]->SetHidden(true);
        }
        return notes;
    });
}

std::unique_ptr<KFS_Stream> JoinedCopy(KFS_Stream const& leader, MoveNotes* notes)
{
    return Told([&] {
        MoveNotes own;
        Leaf joined = MakeLeader(leader, CheckedFollowers(const_cast<KFS_Stream&>(leader)), notes ? *notes : own);
        joined->SetDimensionsSeparated(false);
        joined->SetHidden(false);
        return joined;
    });
}

}  // namespace kfshost
