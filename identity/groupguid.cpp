// The render identity of groups: the children's, in an order that doesn't depend on the display, without those that
// can't change what is rendered.

#include "identity/mixin_private.h"
#include "identity/renderoptions.h"
#include "overrides/parambag.h"
#include "tree/indexedgroup.h"
#include "tree/namedgroup.h"

using hearth::utility::Guid;

namespace {

bool Counts(KFS_StreamBase const* child, KFS_RenderOptionsBase const& options, GetRenderGuidFilter* filter)
{
    return (!filter || filter->IncludeStream(child)) && child->IncludeInGuidComputation(options);
}

void MixInChild(KFSp_IdentityHash& hash, KFS_StreamBase const* child, KFS_RenderOptionsBase const& options,
                GetRenderGuidFilter* filter)
{
    Guid const guid = child->GetRenderGuid(options, filter);
    if (filter) filter->StreamGuidComputed(child, &guid);
    hash.Mix(guid.GuidToBytes().data(), 16);
}

}  // namespace

bool KFS_StreamBase::IncludeInGuidComputation(KFS_RenderOptionsBase const& options) const
{
    // A separated leader is hidden from the user, and still stands for the value.
    if (IsHidden() && !AffectsRenderingWhenHidden() && !AreDimensionsSeparated()) return false;
    if (!IsActive() && !options.GetParamBag()->StreamOverridden(this)) return false;
    return AffectsRendering(options);
}

Guid KFS_NamedStreamGroup::GetRenderGuid(KFS_RenderOptionsBase const& options, GetRenderGuidFilter* filter) const
{
    KFSp_IdentityHash hash;
    KFSp_MixInMatchName(hash, GetMatchName());
    // By index, since a child that becomes real takes its slot in the list that is walked.
    for (std::size_t i = 0; i < streams_.size(); ++i) {
        KFS_StreamBase const* child = streams_[i];
        if (!child || !Counts(child, options, filter)) continue;
        if (child->IsCanonical())
            child = const_cast<KFS_NamedStreamGroup*>(this)->GetEditableStream(KFS_MatchName(child->GetMatchName()));
        MixInChild(hash, child, options, filter);
    }
    return hash.GetGuid();
}

Guid KFS_IndexedStreamGroup::GetRenderGuid(KFS_RenderOptionsBase const& options, GetRenderGuidFilter* filter) const
{
    KFSp_IdentityHash hash;
    KFSp_MixInMatchName(hash, GetMatchName());
    for (KFS_StreamBase const* const child : streams_)
        if (Counts(child, options, filter)) MixInChild(hash, child, options, filter);
    return hash.GetGuid();
}
