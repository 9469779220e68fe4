// The states of a render context that the library knows, and each thread's memory of where they are.

#include "keystore/renderstates_private.h"

#include "frame/errors.h"
#include "keystore/cachestate.h"
#include "keystore/evaluate.h"
#include "keystore/expstate.h"

hearth::utility::ImmutableString const& KFS_ExpState::GetStateName() const
{
    return S_StateName;
}

KFS_ExpState::~KFS_ExpState() = default;

KFS_ExprContext::~KFS_ExprContext() = default;

void KFS_KeysExpState::EvalExprValue(KFS_Stream const*, int, int, void*, KFS_ParamBag const*)
{
    throw static_cast<int>(KFS_Err_ExprNoValue);
}

void KFS_KeysExpState::EvalExprValueF(KFS_Stream const*, int, int, double*, KFS_ParamBag const*)
{
    throw static_cast<int>(KFS_Err_ExprNoValue);
}

void KFS_KeysExpState::EvalNoExprValue(KFS_Stream const* stream, int time, int, void* value, unsigned char* atKey,
                                       KFS_ParamBag const*, KFS_InterpFunc* interpFunc, long refcon)
{
    KFS_GetValueNoExpr(stream, time, 0, value, atKey, nullptr, interpFunc, refcon);
}

void KFS_KeysExpState::EvalNoExprValueF(KFS_Stream const* stream, int time, int, double* value, unsigned char* atKey,
                                        KFS_ParamBag const*)
{
    KFS_GetValueFNoExpr(stream, time, 0, value, atKey, nullptr);
}

void KFS_KeysExpState::ResolveExprTarget(KFS_Stream const**, int*, KFS_ParamBag const*, KFS_ParamBag*) {}

boost::shared_ptr<KFS_ExprContext> KFS_KeysExpState::GetExprContext(KFS_Stream const*)
{
    return {};
}

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

constinit thread_local KFSp_KnownStates KFSp_knownStates;

void KFSp_LookUpRenderStates(Q_RenderContext const* context)
{
    KFSp_RenderStates& states = KFSp_knownStates.states;
    states.expState = dynamic_cast<KFS_ExpState*>(context->PeekState(KFS_ExpState::S_StateName));
    states.cacheState = dynamic_cast<KFS_StreamCacheState*>(context->PeekState(KFS_StreamCacheState::S_StateName));
    states.plainKeyReads = states.expState && states.expState->ReadsKeysPlainly();
    KFSp_knownStates.stamp = context->GetStatesStamp();
}

KFS_Stream const* KFSp_SeenInCopy(KFS_Stream const* stream, Q_RenderContext const* context)
{
    return KFSp_GetRenderStates(context).cacheState ? KFSp_Seen(stream) : stream;
}
