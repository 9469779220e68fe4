// The scope in which a stream takes doubles. Apart, because handles (curves/) are set in it too.

#include "keystore/edit_private.h"

#include "frame/boundary_private.h"
#include "keystore/items_private.h"

#include <utility>

namespace {

KFS_ValueDesc const& DoubleDescription()
{
    static KFS_ValueDesc const desc{0, 0, KFS_Type_Double, nullptr};
    return desc;
}

}  // namespace

KFSp_ScDoubleValues::KFSp_ScDoubleValues(KFS_Stream* stream, KFS_CopyItemFunc copy)
    : stream_(stream),
      copy_(stream->GetCopyItemFunc()),
      dispose_(stream->GetDisposeItemFunc()),
      interp_(stream->GetInterpFunc()),
      saved_(*stream->GetValueDesc()),
      wasNonCustom_(stream->IsTemporarilyNonCustom())
{
    stream->SetCopyItemFunc(copy);
    code_ = KFS_SetValueDescription(stream, &DoubleDescription(), nullptr);
    if (code_ == 0) code_ = KFSp_SetKeyFuncs(stream);
}

KFSp_ScDoubleValues::~KFSp_ScDoubleValues()
{
    static_cast<void>(Restore());  // whoever wants the code has restored before
}

int KFSp_ScDoubleValues::Restore()
{
    KFS_Stream* const stream = std::exchange(stream_, nullptr);
    if (!stream) return 0;
    KFSp_FirstError error;
    error.Keep(KFS_SetValueDescription(stream, &saved_, nullptr));
    *stream->GetValueDescForModify() = saved_;
    stream->MarkTemporarilyNonCustom(wasNonCustom_);
    stream->SetInterpFunc(interp_);
    stream->SetCopyItemFunc(copy_);
    stream->SetDisposeItemFunc(dispose_);
    stream->ShowChangeInCopy();
    error.Keep(KFSp_SetKeyFuncs(stream));  // also of a list that was made meanwhile
    return error.Code();
}
