// What the tree asks of leaves.
#include "tree/leafhooks_private.h"

#include "frame/boundary_private.h"
#include "keystore/attributes.h"
#include "keystore/stream.h"

namespace {

constexpr T_Time DefaultKeyTime{0, 1};

}  // namespace

void KFSp_InsertDefaultKey(KFS_Stream* leaf)
{
    leaf->InsertDefaultKey(DefaultKeyTime);
}

void KFSp_ResetAfterStored(KFS_Stream* leaf)
{
    if (leaf->NeedsResetAfterStored()) leaf->InsertDefaultKey(DefaultKeyTime);
}

void KFSp_GiveKey(KFS_Stream* leaf)
{
    KFSp_ThrowIf(leaf->SetConstant(false, true));
}

void KFSp_SetUpClone(KFS_Stream* leaf, unsigned int timeScale, bool constant)
{
    leaf->SetTimeScale(timeScale);
    KFSp_ThrowIf(leaf->SetConstant(constant, false));
}

void KFSp_Rescale(KFS_Stream* leaf, unsigned int timeScale)
{
    KFSp_ThrowIf(KFS_RescaleStream(leaf, timeScale));
}
