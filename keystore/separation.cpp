// Leaders and followers: the operations of KFS_Stream that find one from the other, and the follower's class.
#include "keystore/separation.h"

#include "frame/services/strings.h"
#include "tree/namedgroup.h"

#include <string>

namespace {

// Finding a follower or leader makes it real, so a group is asked as one that may be edited.
KFS_NamedStreamGroup* GroupOf(KFS_Stream const* stream)
{
    KFS_StreamGroup* const parent = const_cast<KFS_Stream*>(stream)->GetParent();
    return parent ? parent->GetAsNamedGroup() : nullptr;
}

KFS_Stream* LeafAt(KFS_NamedStreamGroup* group, unsigned int index)
{
    KFS_StreamBase* const child = group->GetEditableStream(index);
    return child ? child->GetAsLeaf() : nullptr;
}

template <class Stream>
void FindFollowers(KFS_Stream const* leader, std::vector<Stream*>& followers)
{
    followers.clear();
    KFS_NamedStreamGroup* const group = GroupOf(leader);
    if (!group) return;
    unsigned int const index = group->GetIndexInUILayout(leader->GetMatchName());
    for (int k = 1; k <= leader->GetEffectiveDimension(); ++k)
        followers.push_back(LeafAt(group, index + static_cast<unsigned int>(k)));
}

// The name of a leader's follower.
KFS_MatchName FollowerName(KFS_Stream const& leader, int dimension)
{
    u16str const number = Q_AsciiToUTF16String(std::to_string(dimension).c_str());
    u16str const text = leader.GetMatchName16Str() + Q_AsciiToUTF16String("_") + number;
    return {Q_UTF16ToMBString(text).c_str(), true};
}

KFS_ValueDesc DoubleDesc()
{
    KFS_ValueDesc desc{};
    desc.dataType = KFS_Type_Double;
    return desc;
}

u16str Space()
{
    return Q_AsciiToUTF16String(" ");
}

}  // namespace

// ---- KFS_Stream

bool KFS_Stream::IsSeparationLeader() const
{
    return false;
}

bool KFS_Stream::IsSeparationFollower() const
{
    return false;
}

unsigned int KFS_Stream::IndexInLayout(KFS_NamedStreamGroup const* group) const
{
    unsigned int const guess = lastIndexInLayout_.load(std::memory_order_relaxed);
    unsigned int const index = group->GetIndexInUILayout(GetMatchName(), guess);
    if (index != guess) lastIndexInLayout_.store(index, std::memory_order_relaxed);
    return index;
}

int KFS_Stream::GetSeparationDimension() const
{
    KFS_NamedStreamGroup const* const group = GroupOf(this);
    if (!group) return 0;
    unsigned int const own = group->GetIndexInUILayout(GetMatchName());
    KFS_Stream const* const leader = GetSeparationLeader();
    if (!leader) return 0;
    return static_cast<int>(own - group->GetIndexInUILayout(leader->GetMatchName()) - 1);
}

KFS_Stream* KFS_Stream::GetSeparationLeader()
{
    return const_cast<KFS_Stream*>(std::as_const(*this).GetSeparationLeader());
}

KFS_Stream const* KFS_Stream::GetSeparationLeader() const
{
    if (IsCanonical()) return nullptr;
    KFS_NamedStreamGroup* const group = GroupOf(this);
    if (!group) return nullptr;
    KFS_Stream const* found = nullptr;
    for (unsigned int i = group->GetIndexInUILayout(GetMatchName()); i-- > 0;) {
        found = LeafAt(group, i);
        if (!found || found->IsSeparationLeader()) break;
    }
    return found;
}

void KFS_Stream::GetSeparationFollowers(std::vector<KFS_Stream*>& followers)
{
    FindFollowers(this, followers);
}

void KFS_Stream::GetSeparationFollowers(std::vector<KFS_Stream const*>& followers) const
{
    FindFollowers(this, followers);
}

KFS_Stream* KFS_Stream::GetSeparationFollower(int dimension)
{
    return const_cast<KFS_Stream*>(std::as_const(*this).GetSeparationFollower(dimension));
}

KFS_Stream const* KFS_Stream::GetSeparationFollower(int dimension) const
{
    KFS_NamedStreamGroup* const group = GroupOf(this);
    return group ? LeafAt(group, IndexInLayout(group) + static_cast<unsigned int>(dimension) + 1) : nullptr;
}

// ---- followers

KFS_SeparationFollowerStream::KFS_SeparationFollowerStream(KFS_MatchName const& name, unsigned int timeScale,
                                                           KFS_StreamFactory* factory)
    : KFS_FloatStream(1, timeScale, 1, 0, 0xFFFF, KFS_InterpMask_Linear, DoubleDesc(), &name, factory, false)
{}

KFS_SeparationFollowerStream::KFS_SeparationFollowerStream(KFS_Stream const& leader, int dimension,
                                                           KFS_StreamFactory* factory)
    : KFS_SeparationFollowerStream(FollowerName(leader, dimension), leader.GetTimeScale(), factory)
{
    SetStreamBaseFlags(KFS_BaseFlag_Active | KFS_BaseFlag_Hidden, ~static_cast<unsigned int>(KFS_BaseFlag_Canonical));
    SetDisplayName(leader.GetDimensionName(static_cast<short>(dimension)) + Space() + leader.GetDisplayName());
    static_cast<void>(GetParamDef());  // the record is to be there before anybody looks
}

KFS_SeparationFollowerStream::KFS_SeparationFollowerStream(KFS_SeparationFollowerStream const& source,
                                                           KFS_CloneStreamParams const& params)
    : KFS_FloatStream(source, params)
{}

KFS_StreamBase* KFS_SeparationFollowerStream::CloneStream(KFS_CloneStreamParams const& params) const
{
    return new KFS_SeparationFollowerStream(*this, params);
}

u16str KFS_SeparationFollowerStream::GetEnglishDisplayName() const
{
    KFS_Stream const* const leader = GetSeparationLeader();
    if (!leader) return GetDisplayName();
    return leader->GetEnglishDimensionName(static_cast<short>(GetSeparationDimension())) + Space() +
           leader->GetEnglishDisplayName();
}

bool KFS_SeparationFollowerStream::IsSeparationFollower() const
{
    return true;
}

KFS_Stream* KFS_SeparationFollowerStream::GetSeparationLeader()
{
    return const_cast<KFS_Stream*>(std::as_const(*this).GetSeparationLeader());
}

KFS_Stream const* KFS_SeparationFollowerStream::GetSeparationLeader() const
{
    if (KFS_Stream const* const leader = GetExplicitSeparationLeader()) return leader;
    return KFS_Stream::GetSeparationLeader();
}

double KFS_SeparationFollowerStream::GetDefaultValue() const
{
    KFS_Stream const* const leader = GetSeparationLeader();
    int const dimension = GetSeparationDimension();
    return leader && dimension >= 0 && dimension < 4 ? leader->GetDefaultVector4()[dimension] : 0.0;
}

KFS_Stream* KFS_SeparationFollowerStream::GetExplicitSeparationLeader() const
{
    return explicitLeader_ ? *explicitLeader_ : nullptr;
}

void KFS_SeparationFollowerStream::SetExplicitSeparationLeader(KFS_Stream* leader)
{
    explicitLeader_ = std::make_unique<KFS_Stream*>(leader);
}
