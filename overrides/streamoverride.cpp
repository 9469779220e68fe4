#include "overrides/streamoverride.h"

#include <cstdint>
#include <functional>
#include <utility>

namespace {

// Feeds a value of whichever kind.
class MixValue : public boost::static_visitor<> {
public:
    explicit MixValue(KFS_OverrideHash& hash) : hash_(hash) {}

    void operator()(u16str const& text) const { hash_.Mix(text.data(), text.size() * sizeof(unsigned short)); }
    void operator()(std::vector<double> const& numbers) const
    {
        hash_.Mix(numbers.data(), numbers.size() * sizeof(double));
    }
    template <class Info>
    void operator()(Info const& info) const
    {
        info.MixIn(hash_);
    }

private:
    KFS_OverrideHash& hash_;
};

void MixAddress(KFS_OverrideHash& hash, void const* address)
{
    hash.MixNumber(static_cast<std::uint64_t>(reinterpret_cast<std::uintptr_t>(address)));
}

}  // namespace

KFS_StreamOverride::KFS_StreamOverride(KFS_StreamBase const* stream, KFS_OverrideValue value, bool forEffectStream)
    : stream_(stream),
      value_(std::move(value)),
      flags_(forEffectStream ? KFS_OverrideFlag_ForEffectStream : 0)
{}

KFS_StreamOverride::KFS_StreamOverride(KFS_StreamBase const* stream, KFS_OverrideValue value, KFS_Stream const* getter,
                                       T_Time offset, ValueFunc const& func, hearth::utility::Guid identity,
                                       bool forEffectStream)
    : KFS_StreamOverride(stream, std::move(value), forEffectStream)
{
    valueGetterStream_ = getter;
    valueGetterOffset_ = offset;
    valueFunc_ = func;
    identity_ = identity;
}

KFS_StreamOverride::KFS_StreamOverride(KFS_StreamOverride const& source) = default;

KFS_StreamOverride::~KFS_StreamOverride() = default;

KFS_OverrideValue KFS_StreamOverride::GetValAtTime(T_Time const& time) const
{
    KFS_OverrideValue value = value_;
    if (!valueFunc_.empty()) valueFunc_(time, value);
    return value;
}

bool KFS_StreamOverride::GetValueGetterStream(KFS_Stream const** stream, T_TimeSpan* span) const
{
    if (!valueGetterStream_) return false;
    *stream = valueGetterStream_;
    if (span) span->start = span->start + valueGetterOffset_;
    return true;
}

void KFS_StreamOverride::SetIgnoreExpressions(bool ignore)
{
    unsigned int const flag = KFS_OverrideFlag_IgnoreExpressions;
    flags_ = static_cast<unsigned short>(ignore ? flags_ | flag : flags_ & ~flag);
}

void KFS_StreamOverride::MixIn(KFS_OverrideHash& hash) const
{
    hash.MixNumber(flags_);
    MixAddress(hash, stream_);
    boost::apply_visitor(MixValue(hash), value_);
    if (!valueGetterStream_) return;
    MixAddress(hash, valueGetterStream_);
    hash.MixNumber(valueGetterOffset_.value);
    hash.MixNumber(valueGetterOffset_.scale);
    hash.Mix(identity_.GuidToBytes().data(), 16);
}

bool KFS_StreamOverride::operator==(KFS_StreamOverride const& other) const
{
    if (stream_ != other.stream_ || flags_ != other.flags_) return false;
    if (!valueGetterStream_) return value_ == other.value_;
    return valueGetterStream_ == other.valueGetterStream_ && valueGetterOffset_ == other.valueGetterOffset_ &&
           identity_ == other.identity_;
}

bool KFS_StreamOverride::operator<(KFS_StreamOverride const& other) const
{
    if (stream_ != other.stream_) return std::less<>()(stream_, other.stream_);
    if (!valueGetterStream_) {
        if (value_.which() == other.value_.which() && value_ == other.value_) return flags_ < other.flags_;
        return value_ < other.value_;
    }
    if (valueGetterStream_ != other.valueGetterStream_)
        return std::less<>()(valueGetterStream_, other.valueGetterStream_);
    if (valueGetterOffset_ != other.valueGetterOffset_) return valueGetterOffset_ < other.valueGetterOffset_;
    return identity_ == other.identity_ ? flags_ < other.flags_ : identity_ < other.identity_;
}
