// A render state of the frame that holds a bag, which the frame doesn't know.
#include "frame/project.h"
#include "overrides/parambag.h"

KFS_CapsuleOverrides::KFS_CapsuleOverrides(Q_RenderContext*) : bag_(new KFS_ParamBag) {}

hearth::utility::ImmutableString const& KFS_CapsuleOverrides::GetStateName() const
{
    return S_StateName;
}

KFS_CapsuleOverrides::~KFS_CapsuleOverrides() = default;

void KFS_CapsuleOverrides::SetScopedCapsuleParamBag(Q_ScSetReset<KFS_ParamBag>& scope, KFS_ParamBag const& bag)
{
    scope.Arm(bag_.get());
    *bag_ = bag;
}

void KFS_CapsuleOverrides::MergeInScopedCapsuleParamBag(Q_ScSetReset<KFS_ParamBag>& scope, KFS_ParamBag const& bag)
{
    KFS_ParamBag const merged(*bag_, bag);
    scope.Arm(bag_.get());
    *bag_ = merged;
}
