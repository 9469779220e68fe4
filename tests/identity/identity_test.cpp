#include "curves/spacetangents.h"
#include "curves/tangents.h"
#include "host/identities.h"
#include "identity/renderoptions.h"
#include "keystore/keyflags.h"
#include "keystore/lookup.h"
#include "overrides/parambag.h"
#include "overrides/streamexpression.h"
#include "tests/support/dice.h"
#include "tests/support/groups.h"
#include "tests/support/text.h"

#include <boost/make_shared.hpp>

#include <algorithm>
#include <functional>

namespace {

using hearth::utility::Guid;

// A span of time to render, with a bag.
class Render : public KFS_RenderOptionsBase {
public:
    Render(T_Time spanStart, T_Time spanDuration) : start(spanStart), duration(spanDuration) {}
    T_Time const* GetTimeSpanStart() const override { return &start; }
    void SetTimeSpanStart(T_Time const* time) override { start = *time; }
    T_Time const* GetTimeSpanDuration() const override { return &duration; }
    void SetTimeSpanDuration(T_Time const* time) override { duration = *time; }
    T_Time const* GetShutterDuration() const override { return &shutter; }
    void GetShutterSpan(int flags, T_Time* shutterStart, T_Time* shutterDuration) const override
    {
        EXPECT_EQ(1, flags);
        *shutterStart = start - shutter;
        *shutterDuration = duration + shutter;
    }
    KFS_ParamBag const* GetParamBag() const override { return &bag; }

    T_Time start, duration, shutter{0, 1};
    KFS_ParamBag bag;
};

// A leaf whose value is a vector, and which counts how often it is asked for one.
class Valued : public KFS_Stream {
public:
    explicit Valued(bool constant, short dimension = 1, bool spatial = false)
        : KFS_Stream(dimension, 600, constant, spatial, KFS_InterpMask_All, spatial ? 4 : 0,
                     {0, 0, KFS_Type_Double, nullptr}, nullptr, nullptr, false)
    {}
    void Key(int seconds, double value, char interp)
    {
        T_Time const at{seconds, 1};
        EXPECT_EQ(0, KFS_InsertKeyF(this, &at, 1, &value, interp, interp));
    }
    M_Vector4T<double> GetVector4Ex(KFS_EvalData const& eval) const override
    {
        ++reads;
        M_Vector4T<double> vector{};
        KFSp_ThrowIf(KFS_GetValueFPlus(this, &eval.time, eval.flags, vector.v, nullptr, eval.bag));
        return vector;
    }
    bool SameValueAtTimes(T_Time const& a, T_Time const& b, KFS_ParamBag const* bag) const override
    {
        return GetVector4Ex({a, 0, bag}) == GetVector4Ex({b, 0, bag});
    }
    static inline int reads = 0;
};

class Identity : public SceneTest {
protected:
    Identity()
    {
        kinds.Leaf("other", 1, 0.0);
        kinds.Group<TestNamedGroup>("pair", {Name("opacity"), Name("position")});
    }
    static Guid Of(KFS_StreamBase const& stream, Render const& render, GetRenderGuidFilter* filter = nullptr)
    {
        return stream.GetRenderGuid(render, filter);
    }
};

// ---- leaves

int Pick(Dice& dice, std::initializer_list<int> of)
{
    return of.begin()[dice.Below(static_cast<int>(of.size()))];
}

// A random stream, and random edits of it.
class RandomLeaf {
public:
    explicit RandomLeaf(Dice& dice)
        : dice_(dice),
          spatial_(dice.Below(3) == 0),
          stream_(false, static_cast<short>(spatial_ ? 2 + dice.Below(2) : 1 + dice.Below(3)), spatial_)
    {
        for (int keys = 1 + dice.Below(7); keys > 0; --keys) Insert(RandomTime());
        for (int edits = dice.Below(6); edits > 0; --edits) Edit(dice_.Below(Count()));
    }
    KFS_Stream& Get() { return stream_; }
    int Count() const { return stream_.GetKeyCount(); }
    int TimeOf(int index) const
    {
        T_Time time{};
        EXPECT_EQ(0, KFS_IndexToTime(&stream_, index, &time));
        return time.value;
    }
    int RandomTime() { return 100 * dice_.Below(60); }
    // Something about the key at an index.
    void Edit(int index)
    {
        double a[3] = {Value(), Value(), Value()};
        double b[3] = {Value(), Value(), Value()};
        switch (dice_.Below(spatial_ ? 6 : 5)) {
        case 0: {
            char const in = Interp(), out = Interp();
            static_cast<void>(KFS_SetKeyF(&stream_, index, a, in, out));
            break;
        }
        case 1: static_cast<void>(KFS_SetKeyVelocityF(&stream_, index, a, b)); break;
        case 2: {
            double const influence[3] = {dice_.Between(0.01, 1), dice_.Between(0.01, 1), dice_.Between(0.01, 1)};
            static_cast<void>(KFS_SetKeyInfluence(&stream_, index, influence, nullptr));
            break;
        }
        case 3:
            static_cast<void>(KFS_SetKeyModifiable(&stream_, static_cast<unsigned char>(dice_.Below(2)), index));
            break;
        case 4:
            static_cast<void>(KFS_SetKeyContinuous(&stream_, static_cast<unsigned char>(dice_.Below(2)), index));
            break;
        case 5: static_cast<void>(KFS_SetKeySpaceTangentsF(&stream_, index, -1, a, b)); break;
        }
    }
    void Insert(int time)
    {
        double const value[3] = {Value(), Value(), Value()};
        T_Time const at{time, 600};
        char const in = Interp(), out = Interp();  // drawn in this order by every compiler
        EXPECT_EQ(0, KFS_InsertKeyF(&stream_, &at, 1, value, in, out));
    }
    void Remove(int index) { EXPECT_EQ(0, KFS_RemoveKey(&stream_, index, nullptr)); }

    // What a render of the span may look at, bit by bit.
    std::vector<double> Samples(Render const& render) const
    {
        constexpr int Count = 24;
        std::vector<double> samples;
        for (int i = 0; i < Count; ++i) {
            double value[3] = {};
            T_Time const time{render.start.value * Count + render.duration.value * i, render.start.scale * Count};
            EXPECT_EQ(0, KFS_GetValueFPlus(&stream_, &time, 0, value, nullptr, nullptr));
            samples.insert(samples.end(), value, value + stream_.GetDimension());
        }
        return samples;
    }

private:
    double Value() { return dice_.Below(3) == 0 ? dice_.Between(-9, 9) : dice_.Below(3); }
    char Interp()
    {
        return static_cast<char>(
            Pick(dice_, {KFS_Interp_Linear, KFS_Interp_Spline, KFS_Interp_Spline, KFS_Interp_Hold}));
    }

    Dice& dice_;
    bool spatial_;
    Valued stream_;
};

constexpr int Kept = 1000;  // identities that must never become others

TEST_F(Identity, DiffersWhereAValueDiffersAndIgnoresKeysFarAway)
{
    int differing = 0, far = 0;
    hearth::utility::MixHashGuidT<hearth::utility::Murmur3MixerState> all;
    for (int round = 0; round < Rounds(4000); ++round) {
        SCOPED_TRACE(testing::Message() << "round " << round);
        Dice dice(static_cast<std::uint64_t>(round));
        RandomLeaf leaf(dice);
        int const start = 50 * dice.Below(110);
        int const duration = dice.Below(3) == 0 ? 0 : 50 * (1 + dice.Below(20));
        Render const render({start, 600}, {duration, 600});
        Guid const guid = Of(leaf.Get(), render);
        if (round < Kept) all.Mix(guid.GuidToBytes().data(), 16);
        EXPECT_EQ(guid, Of(leaf.Get(), render));
        std::vector<double> const samples = leaf.Samples(render);

        int const edited = dice.Below(leaf.Count());
        int const end = render.start.value + render.duration.value;
        int first = 0, last = leaf.Count() - 1;  // the keys that hold the span between them
        while (first + 1 < leaf.Count() && leaf.TimeOf(first + 1) <= render.start.value) ++first;
        while (last > 0 && leaf.TimeOf(last - 1) >= end) --last;
        bool const farAway = leaf.Count() > 1 && (edited < first - 1 || edited > last + 1);
        switch (farAway ? 0 : dice.Below(6)) {
        default: leaf.Edit(edited); break;
        case 4: leaf.Insert(leaf.RandomTime()); break;
        case 5:
            if (leaf.Count() > 1) leaf.Remove(edited);
            break;
        }
        if (farAway) {
            ++far;
            EXPECT_EQ(guid, Of(leaf.Get(), render)) << "key " << edited << " is beyond " << first << " to " << last;
        } else if (samples != leaf.Samples(render)) {
            ++differing;
            EXPECT_NE(guid, Of(leaf.Get(), render)) << "key " << edited << " of " << leaf.Count();
        }
        if (HasFailure()) return;
    }
    // Caches of rendered frames outlive versions of this library, and are shared by machines.
    EXPECT_EQ("b59aa59508dd2df34cd18888bdca2c5a", kfshost::TextOf(all.GetGuid()));
    EXPECT_GT(differing, 500);
    EXPECT_GT(far, 100);
}

// Where a span may lie without a change, and where it may not.
TEST_F(Identity, FollowsTheSpanOnlyWhereSomethingMoves)
{
    struct Row {
        char const* what;
        char interp;
        double second;
        int start;
        bool same;
    };
    for (Row const& row :
         {Row{"hold", KFS_Interp_Hold, 5, 200, true}, Row{"hold that ends inside", KFS_Interp_Hold, 5, 550, false},
          Row{"line", KFS_Interp_Linear, 5, 200, false}, Row{"flat line", KFS_Interp_Linear, 0, 200, true},
          Row{"curve", KFS_Interp_Spline, 5, 200, false}, Row{"flat curve", KFS_Interp_Spline, 0, 200, true}}) {
        SCOPED_TRACE(row.what);
        Valued leaf(false);
        double const speed = 0;
        for (int i : {0, 1}) {
            leaf.Key(i, i * row.second, row.interp);
            ASSERT_EQ(0, KFS_SetKeyVelocityF(&leaf, i, &speed, &speed));
        }
        Render render({100, 600}, {100, 600});
        Guid const guid = Of(leaf, render);
        render.start.value = row.start;
        EXPECT_EQ(row.same, guid == Of(leaf, render));
        render = {{50, 300}, {10, 60}};
        EXPECT_EQ(guid, Of(leaf, render)) << "the same span in other scales";
    }
}

// The key beyond the span matters only where handles inside follow from it.
TEST_F(Identity, LooksBeyondTheSpanForAutomaticHandles)
{
    for (bool const automatic : {false, true}) {
        Valued leaf(false);
        double const speed = 1;
        for (int i = 0; i < 4; ++i) {
            leaf.Key(i, i * i, KFS_Interp_Spline);
            ASSERT_EQ(0, automatic ? KFS_SetKeyModifiable(&leaf, 1, i) : KFS_SetKeyVelocityF(&leaf, i, &speed, &speed));
        }
        Render const render({700, 600}, {100, 600});
        Guid const guid = Of(leaf, render);
        double const value = 77;
        ASSERT_EQ(0, KFS_SetKeyF(&leaf, 3, &value, 0, 0));
        EXPECT_EQ(automatic, guid != Of(leaf, render));
    }
}

TEST_F(Identity, SamplesExpressions)
{
    struct Row {
        char const* text;
        int seconds;
        bool filtered;
        int samples;
    };
    struct Everything : GetRenderGuidFilter {
        bool IncludeStream(KFS_StreamBase const*) override { return true; }
        void StreamGuidComputed(KFS_StreamBase const*, Guid const*) override {}
    } everything;
    for (Row const& row :
         {Row{"x", 0, false, 1}, Row{"x", 2, false, 4}, Row{"x", 5, false, 5}, Row{"x", 200, false, 128},
          Row{"x", 5, true, 1}, Row{"cacheCompareSamplesPerSecond = 10; x", 100, false, 1000},
          Row{"cacheCompareSamplesPerSecond=0", 100, false, 4}, Row{"cacheCompareSamplesPerSecond", 5, false, 5}}) {
        SCOPED_TRACE(row.text);
        Valued leaf(true);
        leaf.Key(0, 0, KFS_Interp_Linear);
        KFS_SetStreamExpression(&leaf, Text(row.text));
        Valued::reads = 0;
        Of(leaf, Render({1, 1}, {row.seconds, 1}), row.filtered ? &everything : nullptr);
        EXPECT_EQ(row.samples, Valued::reads);
    }
    Valued leaf(true);
    leaf.Key(0, 0, KFS_Interp_Linear);
    KFS_SetStreamExpression(&leaf, Text("cacheCompareSamplesPerSecond = -1"));
    Valued::reads = 0;
    Guid const guid = Of(leaf, Render({1, 1}, {5, 1}));
    EXPECT_EQ(1, Valued::reads);
    std::vector<Reported> const seen = reports.Take();
    ASSERT_EQ(1u, seen.size());
    EXPECT_EQ(0x1d0000, seen[0].id);
    EXPECT_EQ("cacheCompareSamplesPerSecond must be at least 0. Expression Disabled.", seen[0].text);
    EXPECT_EQ(Text(seen[0].text), KFS_GetStreamExprErrorMessage(&leaf));
    EXPECT_EQ(-1, KFS_GetStreamExprErrorLineNum(&leaf));
    EXPECT_FALSE(leaf.HasActiveExpression());
    EXPECT_EQ(guid, Of(leaf, Render({1, 1}, {5, 1}))) << "a constant now";
}

// With a getter the keys are those of the getter, the values those of the stream with the bag.
TEST_F(Identity, FollowsTheSourceOfAnOverride)
{
    Valued leaf(false), getter(false);
    for (int i : {0, 1, 2}) getter.Key(i, i, KFS_Interp_Linear);
    leaf.Key(0, 0, KFS_Interp_Linear);
    Render render({100, 600}, {100, 600});
    render.bag.AddOverride(&leaf, boost::make_shared<KFS_StreamOverride>(
                                      &leaf, KFS_OverrideValue(std::vector<double>{0}), &getter, T_Time{1, 1},
                                      [&](T_Time const& time, KFS_OverrideValue& value) {
                                          KFSp_ThrowIf(KFS_GetValueF(&getter, &time, 0,
                                                                     boost::get<std::vector<double>>(value).data(),
                                                                     nullptr, nullptr));
                                      },
                                      Guid(), false));
    KFS_StreamOverride const* found = nullptr;
    ASSERT_TRUE(render.bag.GetStreamOverride(&leaf, &found));
    Guid const guid = Of(leaf, render);
    double const far = 9, near = 8;
    ASSERT_EQ(0, KFS_SetKeyF(&getter, 0, &far, 0, 0));
    EXPECT_EQ(guid, Of(leaf, render)) << "the span lies a second later there";
    ASSERT_EQ(0, KFS_SetKeyF(&getter, 2, &near, 0, 0));
    EXPECT_NE(guid, Of(leaf, render));
}

// ---- trees

TEST_F(Identity, OfATreeIsThatOfItsCountingChildren)
{
    struct Watching : GetRenderGuidFilter {
        bool IncludeStream(KFS_StreamBase const* stream) override { return stream != hidden; }
        void StreamGuidComputed(KFS_StreamBase const* stream, Guid const* guid) override
        {
            seen.emplace_back(stream, *guid);
        }
        KFS_StreamBase const* hidden = nullptr;
        std::vector<std::pair<KFS_StreamBase const*, Guid>> seen;
    };
    TestRoot<TestIndexedGroup> root("layers");
    KFS_NamedStreamGroup* const first = AddNode(root);
    KFS_NamedStreamGroup* const second = AddNode(root);
    Render render({0, 1}, {1, 1});
    // Children are mixed behind the name: by index, and in named groups by the hash of their names.
    Watching watching;
    Guid const guid = Of(root, render, &watching);
    std::vector<KFS_StreamBase const*> order;
    for (auto const& [stream, childGuid] : watching.seen) order.push_back(stream);
    ASSERT_EQ(first, order[6]) << "a child comes behind its own children";
    EXPECT_EQ(second, order.back());
    hearth::utility::MixHashGuidT<hearth::utility::Murmur3MixerState> hash;
    hash.Mix("layers", 6);
    for (auto const& [stream, childGuid] : watching.seen)
        if (stream->GetParent() == &root) hash.Mix(childGuid.GuidToBytes().data(), 16);
    EXPECT_EQ(hash.GetGuid(), guid);
    EXPECT_EQ(guid, Of(root, render));

    KFS_StreamBase* const opacity = first->GetEditableStream(Name("opacity"));
    EXPECT_FALSE(opacity->IsCanonical());
    auto const changes = [&](std::function<void()> const& change) {
        Guid const before = Of(root, render);
        change();
        return before != Of(root, render);
    };
    EXPECT_TRUE(changes([&] { opacity->SetActive(false); }));
    EXPECT_TRUE(changes([&] {
        render.bag.AddOverride(
            opacity, boost::make_shared<KFS_StreamOverride>(opacity, KFS_OverrideValue(std::vector<double>{1}), false));
    })) << "inactive, but overridden";
    EXPECT_TRUE(changes([&] { opacity->SetHidden(true); }));
    EXPECT_TRUE(changes([&] { opacity->SetAffectsRenderingWhenHidden(true); }));
    EXPECT_TRUE(changes([&] { opacity->SetAffectsRenderingWhenHidden(false); }));
    EXPECT_TRUE(changes([&] { opacity->SetDimensionsSeparated(true); })) << "a hidden leader counts";
    watching.hidden = second;
    EXPECT_NE(Of(root, render), Of(root, render, &watching));

    render.shutter = {1, 4};
    render.ExtendTimespanToIncludeShutter();
    EXPECT_EQ((T_Time{-1, 4}), render.start);
    EXPECT_EQ((T_Time{5, 4}), render.duration);
    render.shutter = {0, 1};
    render.ExtendTimespanToIncludeShutter();
    EXPECT_EQ((T_Time{-1, 4}), render.start);
}

}  // namespace
