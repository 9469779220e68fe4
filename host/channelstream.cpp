// The leaves of scenes: what distinguishes their kinds is one table.
#include "host/channelstream.h"

#include "frame/errors.h"
#include "frame/frame.h"
#include "frame/services/strings.h"
#include "keystore/edit.h"

#include <algorithm>
#include <array>
#include <iterator>
#include <string>

namespace kfshost {

namespace {

// What an editor offers of a component. Angles have the record of angles, which has units and nothing else.
struct Range {
    bool isLimit;  // else all values are as good
    double least;
    double greatest;
};

constexpr double Boundless = 1e9;  // what a stream without limits answers
constexpr Range AnyNumber{false, -Boundless, Boundless};

// A leaf that nothing moves stands at `value`.
struct LeafKind {
    StreamKind kind;
    char const* matchName;
    char const* displayName;
    short dimension;
    std::array<double, 4> value;
    FX_ParamKind paramKind;
    Range range;
    short precision;
};

constexpr LeafKind LeafKinds[] = {
    {StreamKind::Translation, "KFS Translation", "Translation", 3, {}, FX_Param_FLOAT_SLIDER, AnyNumber, 4},
    {StreamKind::Rotation,
     "KFS Rotation",
     "Rotation",
     4,
     {0.0, 0.0, 0.0, 1.0},
     FX_Param_FLOAT_SLIDER,
     {true, -1.0, 1.0},
     4},
    {StreamKind::Scale, "KFS Scale", "Scale", 3, {1.0, 1.0, 1.0, 1.0}, FX_Param_FLOAT_SLIDER, AnyNumber, 4},
    {StreamKind::Weights, "KFS Weights", "Weights", 1, {}, FX_Param_FLOAT_SLIDER, {true, 0.0, 1.0}, 3},
    {StreamKind::Angles, "KFS Angles", "Angles", 3, {}, FX_Param_FIXED_ANGLE, AnyNumber, 0},
};

constexpr bool IsInOrder()
{
    for (std::size_t i = 0; i < std::size(LeafKinds); ++i)
        if (static_cast<std::size_t>(LeafKinds[i].kind) != i) return false;
    return true;
}
static_assert(IsInOrder());

LeafKind const& Row(StreamKind kind)
{
    return LeafKinds[static_cast<std::size_t>(kind)];
}

KFS_ValueDesc Doubles()
{
    KFS_ValueDesc description;
    description.dataType = KFS_Type_Double;
    return description;
}

// A path bends where its tangents say so, and is measured by distance: both need the automatic spatial setting.
unsigned short SpatialMask(StreamForm form)
{
    return form == StreamForm::Path ? KFS_InterpMask_Negative : 0;
}

void PutDefault(ChannelStream& leaf)
{
    std::vector<double> const value = leaf.GetDefaultValue();
    T_Time const start{0, leaf.GetTimeScale()};
    if (int const code = KFS_InsertKeyF(&leaf, &start, 1, value.data(), 0, 0)) throw int{code};
}

}  // namespace

KFS_MatchName const& MatchNameOf(StreamKind kind)
{
    static std::vector<KFS_MatchName> const names = [] {
        std::vector<KFS_MatchName> all;
        for (LeafKind const& row : LeafKinds) all.emplace_back(row.matchName, true);
        return all;
    }();
    return names[static_cast<std::size_t>(kind)];
}

KFS_MatchName FollowerNameOf(StreamKind kind, int dimension)
{
    std::string const name = Row(kind).matchName + ('_' + std::to_string(dimension));
    return {name.c_str(), true};
}

short UsualDimension(StreamKind kind)
{
    return Row(kind).dimension;
}

ChannelStream::ChannelStream(StreamKind kind, short dimension, unsigned int timeScale, StreamForm form, bool constant,
                             KFS_StreamFactory* factory, bool canonical)
    : KFS_DerivedStream(dimension, timeScale, constant, form == StreamForm::Path, KFS_InterpMask_All, SpatialMask(form),
                        Doubles(), &MatchNameOf(kind), factory, canonical),
      kind_(kind)
{
    lives_.fetch_add(1, std::memory_order_relaxed);
    if (constant) PutDefault(*this);
}

ChannelStream::ChannelStream(ChannelStream const& source, KFS_CloneStreamParams const& params)
    : KFS_DerivedStream(source, params),
      kind_(source.kind_)
{
    lives_.fetch_add(1, std::memory_order_relaxed);
}

ChannelStream::~ChannelStream()
{
    lives_.fetch_add(1, std::memory_order_relaxed);
}

KFS_StreamBase* ChannelStream::CloneStream(KFS_CloneStreamParams const& params) const
{
    return new ChannelStream(*this, params);
}

bool ChannelStream::HasMinValue() const
{
    return Row(kind_).range.isLimit;
}

bool ChannelStream::HasMaxValue() const
{
    return Row(kind_).range.isLimit;
}

// In one component there is nothing to separate, and the layout has three followers.
bool ChannelStream::IsSeparationLeader() const
{
    return kind_ == StreamKind::Translation && GetDimension() >= 2 && GetDimension() <= 3;
}

void ChannelStream::FillInParamDef() const
{
    LeafKind const& row = Row(kind_);
    FillInParamDefDetails(row.paramKind, row.range.least, row.range.greatest, row.range.least, row.range.greatest,
                          row.precision, 0, 0, 0, 0);
}

void ChannelStream::FillInDisplayName() const
{
    pSetDisplayName(Q_AsciiToUTF16String(Row(kind_).displayName));
}

std::vector<double> ChannelStream::GetValueEx(KFS_EvalData const& eval) const
{
    std::vector<double> value(static_cast<std::size_t>(GetDimension()));
    if (int const code = KFS_GetValueFPlus(this, &eval.time, eval.flags, value.data(), nullptr, eval.bag))
        throw int{code};
    return value;
}

void ChannelStream::SetValue(T_Time const& time, std::vector<double> const& value)
{
    if (value.size() != static_cast<std::size_t>(GetDimension())) throw int{KFS_Err_BadValueDesc};
    PrepareSetValue(time);
    if (int const code = KFS_InsertKeyF(this, &time, 1, value.data(), 0, 0)) throw int{code};
}

std::vector<double> ChannelStream::GetDefaultValue() const
{
    auto const& standard = Row(kind_).value;
    std::vector<double> value(static_cast<std::size_t>(GetDimension()));
    std::copy_n(standard.begin(), std::min(value.size(), standard.size()), value.begin());
    return value;
}

namespace {

M_Vector4T<double> FirstFour(std::vector<double> const& value)
{
    M_Vector4T<double> vector{};
    for (int i = 0; i < 4 && static_cast<std::size_t>(i) < value.size(); ++i)
        vector[i] = value[static_cast<std::size_t>(i)];
    return vector;
}

}  // namespace

M_Vector4T<double> ChannelStream::GetVector4Ex(KFS_EvalData const& eval) const
{
    return FirstFour(GetValueEx(eval));
}

M_Vector4T<double> ChannelStream::GetDefaultVector4() const
{
    return FirstFour(GetDefaultValue());
}

void ChannelStream::SetVector4(T_Time const& time, M_Vector4T<double> const& vector)
{
    std::vector<double> value(static_cast<std::size_t>(GetDimension()));
    for (int i = 0; i < 4 && static_cast<std::size_t>(i) < value.size(); ++i)
        value[static_cast<std::size_t>(i)] = vector[i];
    SetValue(time, value);
}

std::unique_ptr<ChannelStream> AsChannel(StreamKind kind, std::unique_ptr<KFS_Stream> leaf)
{
    if (auto* const channel = dynamic_cast<ChannelStream*>(leaf.get()); channel && channel->GetKind() == kind) {
        static_cast<void>(leaf.release());
        return std::unique_ptr<ChannelStream>(channel);
    }
    auto channel = std::make_unique<ChannelStream>(kind, leaf->GetDimension(), leaf->GetTimeScale(),
                                                   leaf->IsSpatial() ? StreamForm::Path : StreamForm::Curves, false,
                                                   Get_VX_StreamFactory(), false);
    // Which also exchanges what each is called, and how it is described; of that the kind's is wanted.
    channel->swap(*leaf);
    channel->SetMatchName(MatchNameOf(kind));
    channel->FillInDisplayName();
    channel->FillInParamDef();
    return channel;
}

}  // namespace kfshost
