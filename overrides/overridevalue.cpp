#include "overrides/overridevalue.h"

#include <cstdint>
#include <tuple>

namespace {

void MixUnits(KFS_OverrideHash& hash, u16str const& text)
{
    hash.Mix(text.data(), text.size() * sizeof(unsigned short));
}

auto Attributes(KFS_TextStreamInfo const& info)
{
    return std::tie(info.attribute0, info.attribute1, info.attribute2);
}

}  // namespace

bool KFS_TextStreamTextRunInfo::operator==(KFS_TextStreamTextRunInfo const& other) const
{
    return length == other.length && name == other.name && size == other.size && attributes == other.attributes;
}

bool KFS_TextStreamTextRunInfo::operator!=(KFS_TextStreamTextRunInfo const& other) const
{
    return !(*this == other);
}

bool KFS_TextStreamTextRunInfo::operator<(KFS_TextStreamTextRunInfo const& other) const
{
    if (length != other.length) return length < other.length;
    if (name != other.name) return name < other.name;
    if (!(size == other.size)) return size < other.size;
    return attributes < other.attributes;
}

void KFS_TextStreamTextRunInfo::MixIn(KFS_OverrideHash& hash) const
{
    hash.MixNumber(length);
    MixUnits(hash, name);
    hash.MixNumber(size);
    for (unsigned char const attribute : attributes) hash.MixNumber(attribute);
}

bool KFS_TextStreamInfo::Verify() const
{
    std::int64_t sum = 0;
    for (KFS_TextStreamTextRunInfo const& run : runs) sum += run.length;
    return sum == static_cast<std::int64_t>(text.size());
}

bool KFS_TextStreamInfo::operator==(KFS_TextStreamInfo const& other) const
{
    return text == other.text && Attributes(*this) == Attributes(other) && runs == other.runs;
}

bool KFS_TextStreamInfo::operator!=(KFS_TextStreamInfo const& other) const
{
    return !(*this == other);
}

bool KFS_TextStreamInfo::operator<(KFS_TextStreamInfo const& other) const
{
    if (text != other.text) return text < other.text;
    if (Attributes(*this) != Attributes(other)) return Attributes(*this) < Attributes(other);
    return runs < other.runs;
}

void KFS_TextStreamInfo::MixIn(KFS_OverrideHash& hash) const
{
    MixUnits(hash, text);
    hash.MixNumber(attribute0);
    hash.MixNumber(attribute1);
    hash.MixNumber(attribute2);
    for (KFS_TextStreamTextRunInfo const& run : runs) run.MixIn(hash);
}

KFS_AlternateSourceInfo::KFS_AlternateSourceInfo(int const& id, hearth::utility::Guid const& guid)
    : sourceId(id),
      sourceGuid(guid)
{}

bool KFS_AlternateSourceInfo::operator==(KFS_AlternateSourceInfo const& other) const
{
    return sourceId == other.sourceId && sourceGuid == other.sourceGuid;
}

bool KFS_AlternateSourceInfo::operator!=(KFS_AlternateSourceInfo const& other) const
{
    return !(*this == other);
}

bool KFS_AlternateSourceInfo::operator<(KFS_AlternateSourceInfo const& other) const
{
    return sourceId != other.sourceId ? sourceId < other.sourceId : sourceGuid < other.sourceGuid;
}

void KFS_AlternateSourceInfo::MixIn(KFS_OverrideHash& hash) const
{
    if (sourceId != 0) hash.MixNumber(sourceId);
    if (!(sourceGuid == hearth::utility::Guid())) hash.Mix(sourceGuid.GuidToBytes().data(), 16);
}
