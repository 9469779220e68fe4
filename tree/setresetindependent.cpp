#include "tree/streambase.h"

KFS_ScSetResetIndependent::KFS_ScSetResetIndependent(KFS_StreamBase* stream, bool wanted)
    : stream_(stream),
      saved_(stream->IsIndependent())
{
    if (saved_ != wanted) stream_->MakeIndependent(wanted);
}

KFS_ScSetResetIndependent::~KFS_ScSetResetIndependent()
{
    if (stream_->IsIndependent() == saved_) return;
    try {
        stream_->MakeIndependent(saved_);
    } catch (...) {
        // A destructor has nobody to tell.
    }
}
