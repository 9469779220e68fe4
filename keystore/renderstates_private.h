#pragma once

#include "frame/services/context.h"
#include "keystore/stream.h"

class KFS_ExpState;
class KFS_StreamCacheState;

// What a render context holds for the library, already cast; null where the host put none.
struct KFSp_RenderStates {
    KFS_ExpState* expState = nullptr;
    KFS_StreamCacheState* cacheState = nullptr;
};

// Looked up once a thread and context, and again when the context's states have changed. Valid until the next call on
// this thread.
KFSp_RenderStates const& KFSp_GetRenderStates(Q_RenderContext const* context);

// The stream as the calling thread's reads see it: itself, or on a temporary clone context the stand-in in the render's
// copy, which is made at the first question. Throws what making it throws.
inline KFS_Stream const* KFSp_Seen(KFS_Stream const* stream)
{
    return stream->GetKeyData()->stream;
}

// The same with the thread's context at hand, which may be null.
KFS_Stream const* KFSp_SeenInCopy(KFS_Stream const* stream, Q_RenderContext const* context);
inline KFS_Stream const* KFSp_Seen(KFS_Stream const* stream, Q_RenderContext const* context)
{
    if (!context || !context->GetIsTempCloneContext()) [[likely]]
        return stream;
    return KFSp_SeenInCopy(stream, context);
}
