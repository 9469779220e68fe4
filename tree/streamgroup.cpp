#include "tree/streamgroup.h"

#include "frame/services/scoped.h"
#include "frame/statics_private.h"

KFS_StreamGroup::KFS_StreamGroup(KFS_MatchName const* name, KFS_StreamFactory* factory, bool canonical)
    : KFS_StreamBase(name, factory, canonical)
{
    FX_ParamDef def{};
    def.paramType = FX_Param_GROUP;
    SetParamDef(def);
}

KFS_StreamGroup::KFS_StreamGroup(KFS_StreamGroup const& source) = default;

bool KFS_StreamGroup::IsGroup() const
{
    return true;
}

KFS_StreamGroup* KFS_StreamGroup::GetAsGroup()
{
    return this;
}

KFS_StreamGroup const* KFS_StreamGroup::GetAsGroup() const
{
    return this;
}

void KFS_StreamGroup::NotifyStreamStored(KFS_StreamGroup*, KFS_StreamBase*) {}

unsigned int KFS_StreamGroup::GetPreferredTimeScale() const
{
    return GetParent() ? GetParent()->GetPreferredTimeScale() : 600;
}

int KFS_StreamGroup::EvaluateExpression(KFS_Stream const*, T_Time const*, double*, void**, KFS_ParamBag const*)
{
    return 1;
}

void KFS_StreamGroup::NotifyParentsStreamStored(KFS_StreamGroup* group, KFS_StreamBase* stream)
{
    boost::thread_specific_ptr<bool>& check = KFSp_GetNotifyParentsCheck();
    if (!check.get()) {
        check.reset(new bool(false));
    }
    if (*check) {
        return;
    }
    Q_ScSetReset<bool> const inside(check.get(), true);
    for (KFS_StreamGroup* ancestor = group; ancestor; ancestor = ancestor->GetParent()) {
        ancestor->NotifyStreamStored(group, stream);
    }
}
