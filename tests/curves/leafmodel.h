#pragma once

#include "frame/services/curvekernel.h"
#include "keystore/stream.h"
#include "tests/support/reports.h"

#include <array>
#include <functional>
#include <optional>
#include <string>
#include <vector>

// A slow and obvious twin of a plain leaf, for comparison under random edits: keys in a vector, nothing remembered
// between two questions, no list, no cache record, no packed times. Of what the leaf does lazily only the marks are
// here, since it can be seen when a repair happens. Curves are handed to the kernel, whose arithmetic has tests of its
// own; what curves there are, and which key gets what, is worked out here.

namespace leafmodel {

using Numbers = std::vector<double>;

// What a call did: its result, what it reported, how often it told the listeners.
struct Done {
    int code = 0;
    std::vector<Reported> reports;
    int told = 0;

    bool operator==(Done const&) const = default;
};

struct Key {
    int time = 0;
    int in = 0, out = 0;
    unsigned int flags = 0, spFlags = 0;
    double arc = 0.0;
    Numbers value;
    Numbers inSpeed, inInfluence, outSpeed, outInfluence;  // a number a component; one on a spatial stream
    Numbers inTangent, outTangent;                         // spatial streams

    bool Has(unsigned int flag) const { return (flags & flag) != 0; }
    bool HasSpline() const { return in == KFS_Interp_Spline || out == KFS_Interp_Spline; }
};

struct Range {
    int first = KFS_INVALID_INDEX, last = KFS_INVALID_INDEX;

    bool IsNone() const { return first == KFS_INVALID_INDEX; }
    bool Holds(int index) const { return !IsNone() && index >= first && index <= last; }
    bool operator==(Range const&) const = default;
};

// Indices of keys; -1 where there is none.
struct Around {
    int at = -1, prev = -1, next = -1;
};

struct Settings {
    int dimension = 1;
    unsigned int scale = 600;
    bool constant = false, spatial = false, nonDecreasing = false, sParametrize = false;
    int spInterp = 0;
    unsigned int interpMask = 7;
    double accuracy = 0.0001;
    std::array<double, 4> multiplier{1.0, 1.0, 1.0, 1.0};
};

class Leaf {
public:
    explicit Leaf(Settings const& settings) : set(settings) {}

    Settings set;
    std::vector<Key> keys;
    std::optional<Key> single;  // the value of a constant
    Range stale, arcStale;

    // Edits, as the functions of the same names. Times are in this stream's scale.
    Done InsertKey(int time, bool replace, Numbers const* value, int in, int out);
    Done SetKey(int index, Numbers const* value, int in, int out);
    // The handles of each key count if `handles` is set.
    Done InsertKeys(std::vector<Key> const& batch, bool replace, bool values, bool handles);
    Done RemoveKey(int index, Numbers* value);
    Done CopyKey(Leaf& source, int index, bool replace, int const* time, int* newIndex);
    Done CopyKeys(Leaf& source);
    Done SetKeyTime(int index, int time, int* newIndex, int* oldTime);
    Done SetKeyFlags(int index, unsigned int mask, unsigned int value);
    Done SetKeyTangents(int index, Numbers const* inX, Numbers const* inY, Numbers const* outX, Numbers const* outY,
                        double yScale);
    Done SetKeyVelocity(int index, Numbers const* in, Numbers const* out);
    Done SetKeyInfluence(int index, Numbers const* in, Numbers const* out);
    Done SetKeySpaceTangents(int index, Numbers const* in, Numbers const* out);
    Done SetKeySpFlags(int index, unsigned int mask, unsigned int values);
    Done SetKeySpModifiable(bool on, int index);
    Done SetKeySpContinuous(bool on, int index);
    Done Rescale(unsigned int scale);
    Done SetConstant(bool constant, bool keepValue);
    Done SetSParametrize(bool on);
    Done SetMultiplier(Numbers const& multiplier);
    Done SetSpInterp(int spInterp);
    Done DisposeRemapTables();
    Done SetAccuracy(double accuracy, double& old);
    Done PrepareSetValue(int time);
    Done Swap(Leaf& other);
    Done SwapWithClone();
    Done ForceUpdate();
    void Update();

    // Questions. An answer that isn't given leaves its place alone.
    Done GetValue(int time, Numbers& value, bool& atKey);
    Done GetKey(int index, Numbers& value, int& in, int& out);
    Done GetKeyTangents(int index, Numbers& inX, Numbers& inY, Numbers& outX, Numbers& outY);
    Done GetKeyVelocity(int index, bool zeroAtEnds, Numbers& in, Numbers& out);
    Done GetKeyInfluence(int index, Numbers& in, Numbers& out);
    Done GetClamped(int index, Numbers& inVelocity, Numbers& inInfluence, Numbers& outVelocity, Numbers& outInfluence,
                    bool& clamped);
    Done GetKeySpaceTangents(int index, Numbers& in, Numbers& out);
    Done GetFlags(int index, unsigned int& flags);
    Done GetSpFlags(int index, unsigned int& flags);
    Done FindKeyTime(int time, bool backward, bool atTime, bool& found, int& index, T_Time& keyTime);
    Done FindNearest(int time, int& index, T_Time& keyTime);
    Done TimeToIndex(int time, int& index);
    Done GetKeyIndex(int time, int& index, bool& found);
    Done IndexToTime(int index, T_Time& time);
    Done ForRange(int const* first, int const* last, std::vector<int>& times);
    Done PredictInvalid(int action, int time, int& from, int& to);
    void Choose(int time, int& in, int& out, unsigned int& flags, unsigned int& spFlags) const;

    int Count() const { return static_cast<int>(keys.size()); }

private:
    Done Refuse(int code, int operation, std::string const& text) const;
    Done NoKeys(int operation, std::string const& action) const;
    // What is wrong with asking for a key, if anything.
    Done Check(int index, int operation, std::string const& action) const;
    bool HasNoValue() const { return set.constant ? !single : keys.empty(); }
    bool IsBadIndex(int index) const { return !set.constant && (index < 0 || index >= Count()); }
    bool CanDo(int code, Done& done) const;
    Key& At(int index) { return keys[static_cast<std::size_t>(index)]; }
    Key const& At(int index) const { return keys[static_cast<std::size_t>(index)]; }
    bool Floats(int index) const;
    int LowerBound(int time) const;
    int Find(int time) const;  // -1
    bool IsAuto() const { return set.spInterp == KFS_SpInterp_Auto; }
    double Seconds(int later, int earlier) const;
    double ArcsFrom(int first, int last) const;
    Key EmptyKey(int time, int in, int out) const;

    Around Neighbours(int time, bool allKeys) const;
    Around NeighboursOf(int index, bool allKeys) const;
    Around Anchors(Around around, bool allKeys) const;  // past float keys, unless all count

    Range Marked(int index, int count) const;
    void Mark(int index, int count);
    void MarkArcs(int index, int count);

    int InsertFromCache(Key key, bool overwrite, bool valueGiven, bool tangentsGiven, Done& done);
    void TakeOut(int index);
    void SetDefaultTangents(int time, int mode, Key& key);
    void Subdivide(int time, int mode, Key& key, bool isNew);
    void TakeValue(Key& key, Around const& around);
    void SplitHandles(Around const& around, Key& key, double x, double dt);
    void SplitPath(Around const& beside, Key& key, double t);
    void SplitSpeeds(Around const& around, Key& key, double x, double dt);
    void ComputeFloatTime(int index);
    void UpdateIfStale(int index);
    double Length(int index) const;
    Done AlterSpFlags(int index, unsigned int set, unsigned int clear);

    Numbers Interpolate(int time);
    double SpeedGraph(Key const& a, Key const& b, double total, int time) const;
    struct PathPlace {
        int a = 0, b = 0;  // the anchors
        int segment = 0;   // the key whose arc it is
        double t = 0.0;
        std::array<Numbers, 4> curve;
    };
    PathPlace FindOnPath(int time);
    Numbers InterpolatePath(int time);
};

}  // namespace leafmodel
