#include "keystore/edit_private.h"

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
      interp_(stream->GetInterpFunc()),
      saved_(*stream->GetValueDesc()),
      wasNonCustom_(stream->IsTemporarilyNonCustom())
{
    stream->SetCopyItemFunc(copy);
    code_ = KFS_SetValueDescription(stream, &DoubleDescription(), nullptr);
}

KFSp_ScDoubleValues::~KFSp_ScDoubleValues()
{
    Restore();
}

int KFSp_ScDoubleValues::Restore()
{
    KFS_Stream* const stream = std::exchange(stream_, nullptr);
    if (!stream) {
        return 0;
    }
    int const code = KFS_SetValueDescription(stream, &saved_, nullptr);
    *stream->GetValueDescForModify() = saved_;
    stream->MarkTemporarilyNonCustom(wasNonCustom_);
    stream->SetInterpFunc(interp_);
    stream->SetCopyItemFunc(copy_);
    return code;
}
