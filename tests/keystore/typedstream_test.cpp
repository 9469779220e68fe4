#include "keystore/paramstreams.h"
#include "keystore/separation.h"
#include "overrides/parambag.h"
#include "tests/support/groups.h"

#include <boost/make_shared.hpp>

#include <cmath>
#include <limits>
#include <map>

namespace {

class TypedStream : public StreamTest {};

// ---- the parameter record

KFS_ValueDesc const Doubles{0, 0, KFS_Type_Double, nullptr};

struct DescribedTraits {
    using ValueType = double;
};

// A float stream that says of itself what a test wants.
class Described : public KFS_FloatStream<DescribedTraits> {
public:
    explicit Described(short dimension = 1)
        : KFS_FloatStream(dimension, 600, true, false, KFS_InterpMask_All, 0, Doubles, nullptr, nullptr, false)
    {}
    Described(Described const& source, KFS_CloneStreamParams const& params) : KFS_FloatStream(source, params) {}
    KFS_StreamBase* CloneStream(KFS_CloneStreamParams const& params) const override
    {
        return new Described(*this, params);
    }
    bool HasMinValue() const override { return hasMin; }
    bool HasMaxValue() const override { return hasMax; }
    M_Vector4T<double> GetDefaultVector4() const override { return standard; }
    void FillInDisplayName() const override { pSetDisplayName(Q_AsciiToUTF16String("Shown")); }

    FX_ParamDef const& Fill(int kind, double min, double max, double sliderMin, double sliderMax) const
    {
        FillInParamDefDetails(kind, min, max, sliderMin, sliderMax, 3, 5, 7U, 11, 13);
        return GetParamDef();
    }

    bool hasMin = false, hasMax = false;
    M_Vector4T<double> standard{{2.75, -1.5, 0.1, 300.0}};
};

std::vector<double> Fields(FX_ParamDef const& def)
{
    auto const numbers = [](auto... fields) { return std::vector{static_cast<double>(fields)...}; };
    auto const& [whole, fixed, real] = std::tie(def.value.intSlider, def.value.fixedSlider, def.value.floatSlider);
    auto const& v = def.value;
    switch (def.paramType) {
    case 1: return numbers(whole.validMin, whole.validMax, whole.sliderMin, whole.sliderMax, whole.defaultValue);
    case 2:
        return numbers(fixed.validMin, fixed.validMax, fixed.sliderMin, fixed.sliderMax, fixed.defaultValue,
                       fixed.precision, fixed.displayFlags);
    case 3: return numbers(v.fixedAngle.defaultValue, v.fixedAngle.validMin, v.fixedAngle.validMax);
    case 4: return numbers(v.named.defaultValue);
    case 5: return numbers(v.color.alpha, v.color.red, v.color.green, v.color.blue);
    case 6: return numbers(v.point2d.defaultX, v.point2d.defaultY);
    case 7: return numbers(v.choice.defaultValue);
    case 10:
        return numbers(real.validMin, real.validMax, real.sliderMin, real.sliderMax, real.defaultValue, real.precision,
                       real.displayFlags, real.floatFlags);
    case 18: return numbers(v.point3d.defaultX, v.point3d.defaultY, v.point3d.defaultZ);
    default: return {};
    }
}

TEST_F(TypedStream, DescribesItselfByItsKind)
{
    constexpr double Lowest = -2147483648.0, Highest = 2147483647.0;
    double const nan = std::numeric_limits<double>::quiet_NaN();
    struct Row {
        int kind;
        double min, max, sliderMin, sliderMax;
        bool limited;
        M_Vector4T<double> standard;
        std::vector<double> fields;
    } const rows[] = {
        {1, -1.9, 1.9, 1e12, nan, false, {{-7.9, 0, 0, 0}}, {-1, 1, Highest, 0, -7}},
        {2, -1.5, 0.1, 2, 3, false, {{0.5, 0, 0, 0}}, {-98304, 6554, 131072, 196608, 32768, 3, 5}},
        {3, -1.5, 1.5, 0, 0, false, {{90, 0, 0, 0}}, {5898240, Lowest, Highest}},
        {3, -1.5, 1.5, 0, 0, true, {{90, 0, 0, 0}}, {5898240, -98304, 98304}},
        {4, 0, 0, 0, 0, false, {{1.9, 0, 0, 0}}, {1}},
        {5, 0, 0, 0, 0, false, {{255.9, 1, 300, -1}}, {255, 1, 44, 255}},
        {6, 0, 0, 0, 0, false, {{1.5, -0.25, 0, 0}}, {9830400, -1638400}},
        {7, 0, 0, 0, 0, false, {{2.9, 0, 0, 0}}, {2}},
        {9, 1, 2, 3, 4, false, {{1, 0, 0, 0}}, {}},
        {10, -1.5, 2.5, -1, 2, false, {{0.25, 0, 0, 0}}, {-1.5, 2.5, -1, 2, 0.25, 3, 5, 7}},
        {18, 0, 0, 0, 0, false, {{1.5, -2, 0.25, 0}}, {150, -200, 25}},
    };
    for (Row const& row : rows) {
        SCOPED_TRACE(row.kind);
        Described stream;
        stream.hasMin = stream.hasMax = row.limited;
        stream.standard = row.standard;
        FX_ParamDef const& def = stream.Fill(row.kind, row.min, row.max, row.sliderMin, row.sliderMax);
        EXPECT_EQ(row.fields, Fields(def));
        EXPECT_EQ(row.kind, def.paramType);
        EXPECT_STREQ("Shown", def.name);
        EXPECT_EQ(11, def.reservedWord);
        EXPECT_EQ(13u, def.paramFlags);
    }
}

// The default of a class that gives neither a default nor a record comes from the record that asks for it.
TEST_F(TypedStream, ADefaultThatNobodyGivesIsZero)
{
    class Circular : public Described {
    public:
        M_Vector4T<double> GetDefaultVector4() const override { return KFS_FloatStream::GetDefaultVector4(); }
        void FillInParamDef() const override { FillInParamDefDetails(10, 0, 1, 0, 1, 1, 0, 0, 0, 0); }
    };
    Circular const stream;
    EXPECT_EQ(0.0, stream.GetDefaultValue());
    EXPECT_EQ(0.0, stream.GetDefaultVector4()[0]);
}

// ---- values that own something

struct Token {
    int id = 0;
    bool operator==(Token const& other) const { return id / 100 == other.id / 100; }
};
struct TokenTraits {
    using ValueType = Token;
};

// Hands out numbered values and counts what comes back; the n-th call of GetValueEx or SetValue can fail.
class Tokens : public KFS_DerivedStream<TokenTraits> {
public:
    explicit Tokens(bool noKeys = true)
        : KFS_DerivedStream(1, 600, noKeys, false, 7, 0, Doubles, nullptr, nullptr, false)
    {}
    KFS_StreamBase* CloneStream(KFS_CloneStreamParams const&) const override { return nullptr; }
    Token GetValueEx(KFS_EvalData const& eval) const override
    {
        Step();
        return Made(200 + eval.time.value);
    }
    void SetValue(T_Time const&, Token const& value) override
    {
        Step();
        EXPECT_EQ(1, alive.at(value.id)) << "a dead value was set";
    }
    void DisposeValue(Token value) const override { --alive[value.id]; }
    Token GetDefaultValue() const override { return Made(100); }

    static bool NothingIsHeld()
    {
        for (auto const& [id, count] : alive)
            if (count != 0) return false;
        return !alive.empty();
    }

    static inline std::map<int, int> alive;
    mutable int failAt = 0;

private:
    void Step() const
    {
        if (failAt > 0 && --failAt == 0) throw int{77};
    }
    Token Made(int id) const
    {
        while (alive.contains(id)) ++id;
        alive[id] = 1;
        return {id};
    }
};

TEST_F(TypedStream, GivesEachValueBackOnceWhateverFails)
{
    static constexpr T_Time a{3, 600}, b{9, 600};
    struct Row {
        char const* what;
        void (*run)(Tokens& stream, Tokens& other);
    } const rows[] = {
        {"is modified", [](Tokens& s, Tokens&) { EXPECT_TRUE(s.IsStaticValueModified()); }},
        {"override",
         [](Tokens& s, Tokens&) {
             void* value = new Token(s.GetValue(a, 0));
             static_cast<KFS_Stream&>(s).ExtractCapsuleOverrideValue(value, {a, 0, nullptr});
             EXPECT_NE(nullptr, value) << "it stays as it was";
             for (int times : {1, 2}) {
                 static_cast<KFS_Stream&>(s).DisposeCapsuleOverrideValue(value);
                 EXPECT_EQ(nullptr, value) << times;
             }
         }},
        {"default key", [](Tokens& s, Tokens&) { s.InsertDefaultKey(a); }},
        {"copied default", [](Tokens& s, Tokens& other) { other.CopyDefaultKey(a, &s); }},
        {"forced", [](Tokens& s, Tokens&) { s.ForceInterpolateAtTime(a); }},
        {"validated, and the same",
         [](Tokens& s, Tokens&) {
             Tokens keyed(false);
             keyed.failAt = s.failAt;
             double const zero = 0.0;
             for (T_Time const& key : {a, b}) EXPECT_EQ(0, KFS_InsertKeyF(&keyed, &key, 1, &zero, 1, 1));
             EXPECT_TRUE(keyed.SameValueAtTimes(a, b, nullptr));
             keyed.ValidateCacheAtTime(a);
         }},
        {"key forced", [](Tokens& s, Tokens&) { s.ForceKeyAtTime(a); }},
    };
    for (Row const& row : rows) {
        SCOPED_TRACE(row.what);
        for (int failAt : {0, 1, 2, 3}) {
            Tokens::alive.clear();
            Tokens stream, other;
            stream.failAt = other.failAt = failAt;
            try {
                row.run(stream, other);
            } catch (int code) {
                EXPECT_EQ(77, code);
            }
            EXPECT_TRUE(Tokens::NothingIsHeld() || (failAt == 1 && Tokens::alive.empty())) << "failing at " << failAt;
        }
    }
    Tokens::alive.clear();
    Tokens stream;
    Described unrelated;
    stream.CopyDefaultKey(a, nullptr);
    stream.CopyDefaultKey(a, &unrelated);
    EXPECT_TRUE(Tokens::alive.empty());
}

TEST_F(TypedStream, TakesNumbersOfABag)
{
    Described const stream;
    KFS_ParamBag bag;
    double own = 1.0;
    auto const extracted = [&](KFS_ParamBag const* from) {
        void* value = &own;
        stream.ExtractCapsuleOverrideValue(value, {{3, 1}, 0, from});
        return static_cast<double*>(value);
    };
    EXPECT_EQ(&own, extracted(nullptr));
    EXPECT_EQ(&own, extracted(&bag));
    auto const give = [&](KFS_OverrideValue const& value) {
        bag.AddOverride(&stream, boost::make_shared<KFS_StreamOverride>(&stream, value, false));
    };
    give(std::vector<double>{2.5, 9.0});
    double* value = extracted(&bag);
    ASSERT_NE(&own, value);
    EXPECT_EQ(2.5, *value);
    stream.DisposeCapsuleOverrideValue(value);
    for (KFS_OverrideValue const& noNumber :
         {KFS_OverrideValue(std::vector<double>{}), KFS_OverrideValue(u16str(3, 'a'))}) {
        give(noNumber);
        EXPECT_THROW(extracted(&bag), boost::bad_get);
    }
}

// ---- values in the parameter record

// An application with layers at even addresses, whose flat numbers are odd, and with paths of which 7 is the default.
class Parameters : public TypedStream {
protected:
    Parameters()
    {
        asked = 0;
        KFS_AppCallbacks callbacks{};
        callbacks.layerDefaultValueFunc = [](KFS_ParamLayerStream const*) { return Layer(2); };
        callbacks.layerIndependentFunc = [](KFS_ParamLayerStream const* stream, bool independent) {
            long const number = static_cast<long>(reinterpret_cast<std::intptr_t>(stream->GetValue({5, 1}, 0)));
            return ++asked, independent ? number + 1 : number - 1;
        };
        callbacks.layerRenderGuidFunc = [](KFS_ParamLayerStream const* stream, KFS_RenderOptionsBase const&,
                                           GetRenderGuidFilter* filter) { return GuidOf(stream, filter); };
        callbacks.pathIndependentFunc = [](KFS_ParamPathStream const* stream, bool independent) {
            unsigned int const number = stream->GetValue({5, 1}, 0);
            return ++asked, static_cast<int>(independent ? number + 1 : number - 1);
        };
        callbacks.pathRenderGuidFunc = [](KFS_ParamPathStream const* stream, KFS_RenderOptionsBase const&,
                                          GetRenderGuidFilter* filter) { return GuidOf(stream, filter); };
        KFS_SetCallbacks(callbacks);
    }
    ~Parameters() override { KFS_ClearCallbacks(); }

    static void* Layer(std::intptr_t number) { return reinterpret_cast<void*>(number); }
    static hearth::utility::Guid GuidOf(KFS_Stream const* stream, GetRenderGuidFilter* filter)
    {
        std::array<unsigned char, 16> bytes{};
        std::memcpy(bytes.data(), &stream, sizeof stream);
        std::memcpy(bytes.data() + 8, &filter, sizeof filter);
        return hearth::utility::Guid(bytes);
    }

    // A kind made by the factory, through all that its values go through.
    template <class Stream, class T>
    void Check(int kind, T standard, T other, T otherFlat)
    {
        KFS_ScRegisterStreams batch(Get_VX_StreamFactory());
        batch.Register(
            Name("parameter"),
            [](KFS_MatchName const& name, KFS_StreamFactory* factory, bool constant, unsigned int scale,
               bool canonical) { return new Stream(scale, constant, &name, factory, canonical); },
            false);
        {
            Q_ScAutoPtr<KFS_StreamBase> const made = TestKinds::Make("parameter");
            auto& stream = dynamic_cast<Stream&>(*made);
            EXPECT_EQ(kind, stream.GetParamDef().paramType);
            EXPECT_EQ(KFS_BaseFlag_Active, stream.GetStreamBaseFlags());
            EXPECT_EQ(KFS_StreamFlag_NoKeys, stream.GetKFSFlags());
            EXPECT_FALSE(stream.CanBeAnimated());
            EXPECT_EQ(standard, stream.GetValue({0, 1}, 0));
            EXPECT_FALSE(stream.IsModified());
            stream.SetValue({3, 1}, other);
            EXPECT_EQ(other, stream.GetValue({-9, 1}, 0));
            EXPECT_EQ(other, stream.GetValueEx({{70, 1}, 0, nullptr}));
            EXPECT_TRUE(stream.IsModified());
            T* override = &other;
            stream.ExtractCapsuleOverrideValue(override, {{0, 1}, 0, nullptr});
            EXPECT_EQ(&other, override);

            EXPECT_EQ(stream.GetDisplayName(), stream.GetEnglishDisplayName());
            stream.SetEnglishDisplayName(Q_AsciiToUTF16String("English"));
            std::unique_ptr<KFS_StreamBase> const clone(stream.Clone(true));
            EXPECT_EQ(Q_AsciiToUTF16String("English"), clone->GetEnglishDisplayName());
            EXPECT_EQ(other, dynamic_cast<Stream&>(*clone).GetValue({0, 1}, 0));
            stream.CopyDefaultKey({0, 1}, clone->GetAsLeaf());
            EXPECT_EQ(standard, stream.GetValue({0, 1}, 0));

            clone->MakeIndependent(true);
            EXPECT_TRUE(clone->IsIndependent());
            EXPECT_EQ(otherFlat, dynamic_cast<Stream&>(*clone).GetValue({0, 1}, 0));
            clone->MakeIndependent(false);
            EXPECT_FALSE(clone->IsIndependent());
            EXPECT_EQ(other, dynamic_cast<Stream&>(*clone).GetValue({0, 1}, 0));
            EXPECT_EQ(2, asked);

            alignas(16) int place = 0;  // stands for the host's options and filter, which the library hands on
            auto* const filter = reinterpret_cast<GetRenderGuidFilter*>(&place);
            EXPECT_EQ(GuidOf(&stream, filter),
                      stream.GetRenderGuid(reinterpret_cast<KFS_RenderOptionsBase const&>(place), filter));
        }
        batch.UnregisterAll();
    }

    static inline int asked = 0;  // how often for an exchange
};

TEST_F(Parameters, HoldOneValueForAllTimes)
{
    Check<KFS_ParamLayerStream>(FX_Param_LAYER, Layer(2), Layer(8), Layer(9));
    asked = 0;
    Check<KFS_ParamPathStream>(FX_Param_PATH, 0u, 8u, 9u);
}

TEST_F(Parameters, FlatFormsOfLayers)
{
    KFS_ParamLayerStream stream(600, 1, nullptr, nullptr, false), canonical(600, 1, nullptr, nullptr, true);
    for (KFS_ParamLayerStream* const s : {&stream, &canonical}) s->SetValue({0, 1}, Layer(4));
    EXPECT_EQ(Layer(5), stream.GetFlattenedReserved0());
    EXPECT_EQ(Layer(4), stream.GetValue({0, 1}, 0)) << "it stays as it is";
    stream.MakeIndependent(true);
    EXPECT_EQ(Layer(5), stream.GetFlattenedReserved0());
    EXPECT_EQ(2, asked);
    EXPECT_EQ(nullptr, canonical.GetFlattenedReserved0());
    EXPECT_EQ(2, asked);
    KFS_ParamPathStream path(600, 1, nullptr, nullptr, false);
    path.GetParamDef().value.path.defaultPathIdentifier = 7;
    path.InsertDefaultKey({0, 1});
    EXPECT_EQ(7u, path.GetValue({0, 1}, 0));
    stream.CopyDefaultKey({0, 1}, &path);
    EXPECT_EQ(Layer(5), stream.GetValue({0, 1}, 0)) << "of another kind";
}

// ---- separated dimensions

// A position: a leader of three dimensions whose default is 1, 2, 3.
class Position : public TestLeaf {
public:
    using TestLeaf::TestLeaf;
    bool IsSeparationLeader() const override { return true; }
    M_Vector4T<double> GetDefaultVector4() const override { return {{1.0, 2.0, 3.0, 0.0}}; }
    KFS_StreamBase* CloneStream(KFS_CloneStreamParams const& params) const override
    {
        return new Position(*this, params);
    }
    void FillInParamDef() const override { FillInParamDefDetails(18, 0, 0, 0, 0, 0, 0, 0, 0, 0); }
};

class Separation : public TypedStream {
protected:
    Separation()
    {
        auto const position = [](short dimension) {
            return [dimension](KFS_MatchName const& kind, KFS_StreamFactory* factory, bool constant, unsigned int scale,
                               bool canonical) {
                return new Position(kind, factory, constant, scale, canonical, dimension, 5.0);
            };
        };
        kinds.Leaf("a", 1, 0.0);
        kinds.Leaf("b", 2, 0.0);
        batch.Register(Name("P"), position(3), false);
        batch.Register(Name("Q"), position(2), false);
        kinds.Named("G", {Name("a"), Name("P"), Name("Q"), Name("b")});
        root = std::make_unique<TestNamedGroup>(Name("G"), Get_VX_StreamFactory(), false, std::vector<KFS_MatchName>{});
    }
    ~Separation() override
    {
        root.reset();
        batch.UnregisterAll();
    }
    KFS_Stream* Leaf(char const* name) const { return root->GetEditableLeafStream(Name(name)); }

    KFS_ScRegisterStreams batch{Get_VX_StreamFactory()};
    TestKinds kinds;
    std::unique_ptr<TestNamedGroup> root;
};

TEST_F(Separation, FollowersStandBehindTheirLeader)
{
    std::string order;
    for (unsigned int i = 0; i < root->GetNumStreams(); ++i)
        order += NameOf(static_cast<KFS_StreamGroup const&>(*root).GetStream(i)) + " ";
    EXPECT_EQ("a P P_0 P_1 P_2 Q Q_0 Q_1 b ", order);

    KFS_Stream const* const canonical = Get_VX_StreamFactory()->GetCanonicalStream(Name("P_1"))->GetAsLeaf();
    EXPECT_TRUE(canonical->IsHidden() && canonical->IsActive() && canonical->IsSeparationFollower());
    EXPECT_TRUE(canonical->HasNoKeys() && canonical->GetInterpMask() == 0xFFFF && canonical->GetSpInterpMask() == 1);
    EXPECT_EQ(nullptr, canonical->GetSeparationLeader());
    EXPECT_EQ(u"Y P", std::u16string(canonical->GetDisplayName().begin(), canonical->GetDisplayName().end()));

    KFS_Stream* const leader = Leaf("P");
    for (int d = 0; d < 3; ++d) {
        KFS_Stream* const follower = leader->GetSeparationFollower(d);
        ASSERT_EQ("P_" + std::to_string(d), NameOf(follower));
        EXPECT_FALSE(follower->IsCanonical());
        EXPECT_EQ(leader, follower->GetSeparationLeader());
        EXPECT_EQ(d, follower->GetSeparationDimension());
        EXPECT_EQ((M_Vector4T<double>{{d + 1.0, 0.0, 0.0, 0.0}}), follower->GetDefaultVector4());
        EXPECT_EQ((M_Vector4T<double>{}), follower->GetVector4({0, 1}, 0)) << "it began before it had a leader";
        EXPECT_EQ(leader->GetEnglishDimensionName(static_cast<short>(d)) + Q_AsciiToUTF16String(" ") +
                      leader->GetEnglishDisplayName(),
                  follower->GetEnglishDisplayName());
        EXPECT_EQ(leader->GetUnitsName(), follower->GetUnitsName());
        KFS_StreamIDPath path;
        path.AddTail(Name("P"));
        KFS_StreamIDPath const found = root->GetLeafSeparationPath(path, d);
        EXPECT_EQ(follower, root->FindStream(found));
        follower->SetMatchName(Name("renamed"));
        EXPECT_EQ(found, root->GetLeafSeparationPath(path, d));
        follower->SetMatchName(found.GetTail().GetMatchName());
        EXPECT_FALSE(root->AreLeafDimensionsSeparated(path));
    }
    std::vector<KFS_Stream*> followers{leader};
    Leaf("Q")->GetSeparationFollowers(followers);
    ASSERT_EQ(2u, followers.size());
    EXPECT_EQ("Q_1", NameOf(followers[1]));

    auto* const follower = dynamic_cast<KFS_SeparationFollowerStream*>(followers[0]);
    ASSERT_TRUE(follower);
    follower->SetExplicitSeparationLeader(leader);
    EXPECT_EQ(leader, follower->GetSeparationLeader());
    std::unique_ptr<KFS_StreamBase> const clone(follower->Clone(true));
    EXPECT_EQ(nullptr, clone->GetAsLeaf()->GetSeparationLeader());
}

TEST_F(Separation, AnotherPropertyInAFollowersPlaceHasNoSay)
{
    T_Time const start{0, 600}, half{300, 600};
    char** many = nullptr;
    KFS_Stream* const leader = Leaf("Q");
    leader->SetDimension(3);
    leader->SetDimensionsSeparated(true);
    double wide[4] = {-1.0, -1.0, -1.0, -1.0};
    EXPECT_EQ(0, KFS_GetValueFPlus(leader, &half, 0, wide, nullptr, nullptr));
    EXPECT_EQ(-1.0, wide[2]);
    ASSERT_EQ(0, KFS_GetValuesFPlus(leader, &start, &half, 1, 0, &many));
    EXPECT_EQ(0.0, reinterpret_cast<double*>(*many)[2]);
    Q_FreeHandle(many);
    leader->SetDimension(2);
}

// A kind that is registered again finds its followers' names free.
TEST_F(Separation, FollowersGoWithTheirLeadersKind)
{
    root.reset();
    batch.UnregisterAll();
    EXPECT_EQ(nullptr, Get_VX_StreamFactory()->GetCanonicalInstance(Name("P_0")));
}

}  // namespace
