// The states of a render context that the library knows, and each thread's memory of where they are.

#include "keystore/renderstates_private.h"

#include "keystore/cachestate.h"
#include "keystore/expstate.h"

hearth::utility::ImmutableString const& KFS_ExpState::GetStateName() const
{
    return S_StateName;
}

KFS_ExpState::~KFS_ExpState() = default;

KFS_ExprContext::~KFS_ExprContext() = default;

KFS_DetectExpressionErrors::KFS_DetectExpressionErrors(KFS_ExpState const* state)
    : state_(state),
      saved_(state->detectingErrors)
{
    state_->detectingErrors = true;
}

KFS_DetectExpressionErrors::KFS_DetectExpressionErrors(boost::shared_ptr<KFS_ExpState> const& state)
    : KFS_DetectExpressionErrors(state.get())
{}

KFS_DetectExpressionErrors::~KFS_DetectExpressionErrors()
{
    state_->detectingErrors = saved_;
    if (!saved_) state_->errorCount = 0;
}

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

KFS_Stream const* KFSp_SeenInCopy(KFS_Stream const* stream, Q_RenderContext const* context)
{
    return KFSp_GetRenderStates(context).cacheState ? KFSp_Seen(stream) : stream;
}
