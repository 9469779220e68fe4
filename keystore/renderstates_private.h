#pragma once

#include "frame/services/context.h"
#include "keystore/cachestate.h"

#include <cstdint>

class KFS_ExpState;

// What a render context holds for the library, already cast; null where the host put none.
struct KFSp_RenderStates {
    KFS_ExpState* expState = nullptr;
    KFS_StreamCacheState* cacheState = nullptr;
    bool plainKeyReads = false;  // expState has promised it
};

// Each thread's memory of the context that it asked last. A hidden variable of constant initialisation, so that looking is
// a load.
struct KFSp_KnownStates {
    std::uint64_t stamp = 0;  // of the context's states; no context has 0
    KFSp_RenderStates states;
};
extern constinit thread_local KFSp_KnownStates KFSp_knownStates;
void KFSp_LookUpRenderStates(Q_RenderContext const* context);

// Looked up once a thread and context, and again when the context's states have changed. Valid until the next call on
// this thread.
inline KFSp_RenderStates const& KFSp_GetRenderStates(Q_RenderContext const* context)
{
    if (context->GetStatesStamp() != KFSp_knownStates.stamp) [[unlikely]]
        KFSp_LookUpRenderStates(context);
    return KFSp_knownStates.states;
}

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

// The key data that a read of the calling thread goes by, for those who have its context at hand. Null where it has to be
// made first, or where the context can't be read in.
struct KFSp_KeyDataDoor {
    static KFS_StreamKeyData const* Find(KFS_Stream const* stream, Q_RenderContext const* context,
                                         KFSp_RenderStates const& states)
    {
        if (!context->GetIsTempCloneContext() || !stream->isWhole_) return &stream->keyData_;
        return states.cacheState ? states.cacheState->Find(stream) : nullptr;
    }
    // Has what reads look at brought from memory.
    static void Fetch(KFS_Stream const* stream)
    {
        __builtin_prefetch(stream);  // what virtual operations need, and the parent
        __builtin_prefetch(&stream->renderSlot_);
        __builtin_prefetch(&stream->keyData_);
        __builtin_prefetch(&stream->keyData_.times);
    }
};
