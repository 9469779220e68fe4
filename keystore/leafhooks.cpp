// What the tree asks of leaves.
#include "tree/leafhooks_private.h"

#include "frame/boundary_private.h"
#include "keystore/attributes.h"
#include "keystore/separation.h"
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

KFS_StreamBase const* KFSp_AsNode(KFS_Stream const* leaf)
{
    return leaf;
}

bool KFSp_IsSeparationLeader(KFS_Stream const* leaf)
{
    return leaf->IsSeparationLeader();
}

int KFSp_CountFollowers(KFS_Stream const* leader)
{
    return leader->GetDimension();
}

KFS_StreamBase* KFSp_MakeFollower(KFS_Stream const* leader, int dimension, KFS_StreamFactory* factory)
{
    return new KFS_SeparationFollowerStream(*leader, dimension, factory);
}
