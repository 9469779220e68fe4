#pragma once

#include "frame/export.h"

class KFS_StreamGroup;

// A switch for development, "VX.DecanonicalizeImmediatelyR" of the debug database, read once: every real group that is
// created, and every slot that is made canonical again, is upgraded at once, as if no defaults were shared.
KFS_API bool KFS_ShouldAlwaysDecanonicalize();

// Upgrades every canonical stream below a group. Does nothing for null, and while the group's project suspends it
// (KFS_RenderState::SuspendAutoDecanonicalize).
KFS_API void KFS_DecanonicalizeAllChildStreamsDeep(KFS_StreamGroup* group);
