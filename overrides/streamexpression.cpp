// The expression of a stream from outside: whoever hears of values hears of these changes too.

#include "overrides/streamexpression.h"

#include "frame/boundary_private.h"
#include "keystore/stream.h"

namespace {

void ForgetError(KFS_Stream* stream)
{
    stream->GetExprInfoForModify().SetExpressionError(u16str(), -1, u16str());
}

}  // namespace

u16str KFS_SetStreamExpression(KFS_Stream* stream, u16str const& text)
{
    u16str old = stream->GetExprInfo().GetExpression();
    stream->GetExprInfoForModify().SetExpression(text);
    ForgetError(stream);
    stream->ShowChangeInCopy();
    stream->NotifyValueChanged();
    return old;
}

u16str KFS_GetStreamExpression(KFS_Stream const* stream)
{
    return stream->GetExprInfo().GetExpression();
}

int KFS_SetStreamExprFlags(KFS_Stream* stream, unsigned int mask, unsigned int value)
{
    KFSp_FirstError error;
    if ((mask & KFS_ExprFlag_Disabled) != 0) error.Keep(KFSp_Boundary([stream] { ForgetError(stream); }));
    error.Keep(KFSp_Boundary([&] { stream->GetExprInfoForModify().SetFlagMask(value, mask); }));
    error.Keep(KFSp_Boundary([stream] { stream->ShowChangeInCopy(); }));
    error.Keep(KFSp_Boundary([stream] { stream->NotifyValueChanged(); }));
    return error.Code();
}

unsigned int KFS_GetStreamExprFlags(KFS_Stream const* stream)
{
    return stream->GetExpressionFlags();
}

void KFS_SetStreamExprErrorMessage(KFS_Stream* stream, u16str const& text, int line, u16str const& shortText)
{
    stream->GetExprInfoForModify().SetExpressionError(text, line, shortText);
    stream->ShowChangeInCopy();
}

u16str KFS_GetStreamExprErrorMessage(KFS_Stream const* stream)
{
    return stream->GetExprInfo().GetExpressionError();
}

int KFS_GetStreamExprErrorLineNum(KFS_Stream const* stream)
{
    return stream->GetExprInfo().GetExpressionErrorLine();
}

u16str KFS_GetStreamShortExprErrorMessage(KFS_Stream const* stream)
{
    return stream->GetExprInfo().GetExpressionErrorShort();
}
