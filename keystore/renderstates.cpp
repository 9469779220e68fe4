#include "keystore/renderstates_private.h"

#include "keystore/cachestate.h"
#include "keystore/expstate.h"

hearth::utility::ImmutableString const& KFS_ExpState::GetStateName() const
{
    return S_StateName;
}

KFS_ExpState::~KFS_ExpState() = default;

KFS_ExprContext::~KFS_ExprContext() = default;

KFSp_RenderStates const& KFSp_GetRenderStates(Q_RenderContext const* context)
{
    thread_local std::uint64_t knownStamp = 0;
    thread_local KFSp_RenderStates known;
    if (context->GetStatesStamp() != knownStamp) [[unlikely]] {
        known.expState = dynamic_cast<KFS_ExpState*>(context->PeekState(KFS_ExpState::S_StateName));
        known.cacheState = dynamic_cast<KFS_StreamCacheState*>(context->PeekState(KFS_StreamCacheState::S_StateName));
        knownStamp = context->GetStatesStamp();
    }
    return known;
}
