#include "tree/decanonicalize.h"

#include "frame/project.h"
#include "frame/services/debug.h"
#include "tree/streamgroup.h"

namespace {

bool IsSuspendedFor(KFS_StreamGroup const* group)
{
    KFS_Project const* const project = KFS_GetConstProject(group, true);
    Q_RenderContext const* const context = project ? project->GetRenderContext(false) : nullptr;
    auto const* const state =
        context ? dynamic_cast<KFS_RenderState const*>(context->PeekState(KFS_RenderState::S_StateName)) : nullptr;
    return state && state->GetAutoDecanonicalizeIsSuspended();
}

}  // namespace

bool KFS_ShouldAlwaysDecanonicalize()
{
    static bool const always =
        hearth::debug::DebugDatabase::Instance().GetEntryAs<bool>("VX.DecanonicalizeImmediatelyR", false);
    return always;
}

void KFS_DecanonicalizeAllChildStreamsDeep(KFS_StreamGroup* group)
{
    if (!group || IsSuspendedFor(group)) return;
    for (unsigned int i = 0; i < group->GetNumStreams(); ++i)
        KFS_DecanonicalizeAllChildStreamsDeep(group->GetEditableStream(i)->GetAsGroup());
}
