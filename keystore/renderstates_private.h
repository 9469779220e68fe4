#pragma once

#include "frame/services/context.h"

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
