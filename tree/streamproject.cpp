// Whose project a stream is of.
#include "frame/project.h"
#include "tree/streambase.h"

KFS_Project const* KFS_GetConstProject(KFS_StreamBase const* stream, bool)
{
    if (stream && !stream->IsCanonical()) {
        if (KFS_Project const* const project = stream->GetProject()) return project;
    }
    return KFS_GetCurrentConstProject();
}

KFS_Project* KFS_GetProject(KFS_StreamBase* stream, bool)
{
    if (stream && !stream->IsCanonical()) {
        if (KFS_Project* const project = stream->GetProject()) return project;
    }
    return KFS_GetCurrentProject();
}
