#include "tree/factory.h"

#include "frame/boundary_private.h"
#include "frame/errors.h"
#include "frame/messages_private.h"
#include "frame/report_private.h"
#include "frame/services/scoped.h"
#include "tree/decanonicalize.h"
#include "tree/leafhooks_private.h"
#include "tree/namedgroup.h"
#include "tree/verify_private.h"

#include <boost/bind/bind.hpp>

#include <algorithm>
#include <utility>
#include <vector>

using hearth::threads::ScRecursiveLock;

namespace {

// Null, unless the unknown kind is to be reported; the report's code is thrown.
KFS_StreamBase* RefuseUnknownKind(KFS_MatchName const& name, bool report)
{
    if (report) {
        char text[256];
        // The only failure is a destination that isn't there.
        static_cast<void>(Q_SubString(text, sizeof text, KFSp_MessageText(KFSp_Row_UnknownStream), name.GetName()));
        KFSp_ThrowIf(Qp_ReportLegacyErrString(KFSp_ModuleId, KFSp_Severity, KFS_Err_UnknownStream, text));
    }
    return nullptr;
}

}  // namespace

KFS_StreamFactory::~KFS_StreamFactory()
{
    ScRecursiveLock const guard(lock_);
    while (!separationMap_.empty()) UnregisterFollowers(separationMap_.begin()->first);
    canonicalInstances_.clear();
    factoryFuncs_.clear();
    obsoleteParents_.clear();
}

bool KFS_StreamFactory::RegisterFactoryFunc(KFS_MatchName const& name, KFS_FactoryFunc const& func, bool deferLayout)
{
    ScRecursiveLock const guard(lock_);
    if (!factoryFuncs_.emplace(name, func).second) return false;
    Q_ScAutoPtr<KFS_StreamBase> instance;
    try {
        instance.reset(CreateStream(name, true, 600, true, true));
        if (!instance) throw int{KFS_Err_UnknownStream};
        canonicalInstances_.emplace(name, instance.get());
        KFS_Stream const* const leaf = instance->GetAsLeaf();
        if (leaf && KFSp_IsSeparationLeader(leaf)) RegisterSeparatedDimensions(leaf);
        if (!deferLayout) instance->SetupCanonicalLayout();
    } catch (...) {
        UnregisterFollowers(name);
        canonicalInstances_.erase(name);
        factoryFuncs_.erase(name);
        throw;
    }
    static_cast<void>(instance.release());
    return true;
}

bool KFS_StreamFactory::UnregisterFactoryFunc(KFS_MatchName const& name)
{
    return UnregisterFactoryFunc_NullOK(name, false);
}

bool KFS_StreamFactory::UnregisterFactoryFunc_NullOK(KFS_MatchName const& name, bool nullOK)
{
    Q_ScAutoPtr<KFS_StreamBase> instance;  // deleted without the lock, and last, since `name` may be its own
    ScRecursiveLock const guard(lock_);
    auto const found = canonicalInstances_.find(name);
    if (found == canonicalInstances_.end()) {
        if (!nullOK) XLOG_Log(0, "KFS", "UnregisterFactoryFunc", reinterpret_cast<char const*>(name.GetName()));
        return false;
    }
    instance.reset(found->second);
    canonicalInstances_.erase(found);
    for (auto& [leader, followers] : separationMap_) std::erase(followers, instance.get());
    UnregisterFollowers(name);
    if (factoryFuncs_.erase(name) == 0) KFSp_FailVerification("couldn't find factory method for stream to unregister");
    return true;
}

KFS_StreamBase* KFS_StreamFactory::CreateStream(KFS_MatchName const& name, bool constant, unsigned int timeScale,
                                                bool reportIfUnknown, bool canonical)
{
    KFS_FactoryFunc func;
    {
        ScRecursiveLock const guard(lock_);
        if (auto const found = factoryFuncs_.find(name); found != factoryFuncs_.end()) func = found->second;
    }
    Q_ScAutoPtr<KFS_StreamBase> stream(func ? func(name, this, true, timeScale, canonical) : nullptr);
    if (!stream) return RefuseUnknownKind(name, reportIfUnknown);
    if (KFS_Stream* const leaf = stream->GetAsLeaf()) {
        KFSp_InsertDefaultKey(leaf);
        if (!constant) KFSp_GiveKey(leaf);
    }
    if (!canonical && KFS_ShouldAlwaysDecanonicalize()) KFS_DecanonicalizeAllChildStreamsDeep(stream->GetAsGroup());
    return stream.release();
}

KFS_StreamBase* KFS_StreamFactory::RegisterCanonicalInstance(KFS_StreamBase* stream)
{
    using boost::placeholders::_1;
    using boost::placeholders::_3;
    using boost::placeholders::_4;
    Q_ScAutoPtr<KFS_StreamBase> instance(stream);
    ScRecursiveLock const guard(lock_);
    KFS_MatchName const name = stream->GetMatchName();
    if (factoryFuncs_.contains(name)) {
        KFS_StreamBase* const registered = GetCanonicalStream(name);
        if (registered == stream) static_cast<void>(instance.release());
        return registered;
    }
    stream->SetCanonical(true);
    stream->SetupCanonicalLayout();
    factoryFuncs_.emplace(name, boost::bind(&KFS_StreamFactory::MakeInstanceFromCanonical, this, _1, _3, _4));
    try {
        canonicalInstances_.emplace(name, stream);
    } catch (...) {
        factoryFuncs_.erase(name);
        throw;
    }
    return instance.release();
}

void KFS_StreamFactory::RegisterSeparatedDimensions(KFS_Stream const* leader)
{
    ScRecursiveLock const guard(lock_);
    int const count = KFSp_CountFollowers(leader);
    std::vector<KFS_StreamBase*>& followers = separationMap_[KFSp_AsNode(leader)->GetMatchName()];
    followers.reserve(static_cast<std::size_t>(std::max(count, 0)));
    for (int d = 0; d < count; ++d) {
        KFS_StreamBase* const made = KFSp_MakeFollower(leader, d, this);
        KFS_StreamBase* const registered = RegisterCanonicalInstance(made);
        if (registered != made) KFSp_FailVerification("a separation follower's name is taken");
        followers.push_back(registered);
    }
}

void KFS_StreamFactory::SetupCanonicalLayoutForSeperatedDimensions(
    std::vector<KFS_StreamBase const*, Q_Allocator<KFS_StreamBase const*>>* layout)
{
    ScRecursiveLock const guard(lock_);
    for (std::size_t i = layout->size(); i-- > 0;) {  // from the end, so that what is still to come keeps its place
        KFS_Stream const* const leaf = (*layout)[i]->GetAsLeaf();
        if (!leaf || !KFSp_IsSeparationLeader(leaf)) continue;
        auto const followers = separationMap_.find((*layout)[i]->GetMatchName());
        if (followers == separationMap_.end()) continue;
        layout->insert(layout->begin() + static_cast<std::ptrdiff_t>(i) + 1, followers->second.begin(),
                       followers->second.end());
    }
}

void KFS_StreamFactory::UnregisterSeperationMapEntry(
    std::pair<KFS_MatchName const, std::vector<KFS_StreamBase*>> const& entry)
{
    for (KFS_StreamBase* const follower : entry.second) UnregisterFactoryFunc_NullOK(follower->GetMatchName(), false);
}

void KFS_StreamFactory::UnregisterFollowers(KFS_MatchName const& leader)
{
    // Taken out first: each follower that goes is looked for in what remains.
    auto entry = separationMap_.extract(leader);
    if (!entry.empty()) UnregisterSeperationMapEntry({entry.key(), std::move(entry.mapped())});
}

bool KFS_StreamFactory::UnregisterCanonicalInstance(KFS_StreamBase const* stream)
{
    return UnregisterFactoryFunc_NullOK(stream->GetMatchName(), false);
}

KFS_StreamBase* KFS_StreamFactory::GetCanonicalInstance(KFS_MatchName const& name)
{
    ScRecursiveLock const guard(lock_);
    return factoryFuncs_.contains(name) ? GetCanonicalStream(name) : nullptr;
}

KFS_StreamBase* KFS_StreamFactory::GetCanonicalStream(KFS_MatchName const& name)
{
    ScRecursiveLock const guard(lock_);
    auto const found = canonicalInstances_.find(name);
    return found == canonicalInstances_.end() ? nullptr : found->second;
}

KFS_StreamBase* KFS_StreamFactory::MakeInstanceFromCanonical(KFS_MatchName const& name, bool constant,
                                                             unsigned int timeScale)
{
    KFS_StreamBase const* const canonical = GetCanonicalStream(name);
    Q_ScAutoPtr<KFS_StreamBase> copy(canonical->CloneStream(KFS_CloneStreamParams{true, true}));
    copy->SetCanonical(false);
    copy->SetSMDataPath(canonical->GetSMDataPath());
    if (KFS_Stream* const leaf = copy->GetAsLeaf()) KFSp_SetUpClone(leaf, timeScale, constant);
    return copy.release();
}

void KFS_StreamFactory::SetupCanonicalStream(KFS_MatchName const& name)
{
    GetCanonicalStream(name)->SetupCanonicalLayout();
}

void KFS_StreamFactory::RegisterDataFileContainer(KFS_MatchName const& name)
{
    ScRecursiveLock const guard(lock_);
    dataFileContainers_.insert(name);
}

void KFS_StreamFactory::UnRegisterDataFileContainers()
{
    std::set<KFS_MatchName> const containers = GetDataFileMatchNames();
    for (KFS_MatchName const& name : containers) UnregisterCanonicalMatchName(name, containers);
}

void KFS_StreamFactory::UnregisterCanonicalMatchName(KFS_MatchName const& name, std::set<KFS_MatchName> const& keep)
{
    KFS_StreamBase const* const canonical = GetCanonicalStream(name);
    KFS_StreamGroup const* const group = canonical ? canonical->GetAsGroup() : nullptr;
    if (!group) return;
    UnregisterCanonicalInstanceRecursive(group, keep);
    ScRecursiveLock const guard(lock_);
    dataFileContainers_.erase(name);
}

std::set<KFS_MatchName> KFS_StreamFactory::GetDataFileMatchNames() const
{
    ScRecursiveLock const guard(lock_);
    return dataFileContainers_;
}

void KFS_StreamFactory::RegisterDataFileTextStream(KFS_MatchName const& name)
{
    ScRecursiveLock const guard(lock_);
    dataFileTextStreams_.insert(name);
}

bool KFS_StreamFactory::IsDataFileTextStream(KFS_MatchName const& name) const
{
    ScRecursiveLock const guard(lock_);
    return dataFileTextStreams_.contains(name);
}

void KFS_StreamFactory::UnRegisterDataFileTextStreams()
{
    ScRecursiveLock const guard(lock_);
    dataFileTextStreams_.clear();
}

std::map<KFS_StreamBase const*, KFS_MatchName> KFS_StreamFactory::GetNamesOfInstances() const
{
    ScRecursiveLock const guard(lock_);
    std::map<KFS_StreamBase const*, KFS_MatchName> names;
    for (auto const& [name, instance] : canonicalInstances_) names.emplace(instance, name);
    return names;
}

void KFS_StreamFactory::UnregisterCanonicalInstanceRecursive(KFS_StreamGroup const* group,
                                                             std::set<KFS_MatchName> const& keep)
{
    KFS_MatchName const name = group->GetMatchName();
    auto const layout = group->GetCanonicalLayout(name);
    std::vector<KFS_MatchName> children;
    if (layout) {
        // An instance that another group's unregistration has taken away must not be touched any more.
        auto const registered = GetNamesOfInstances();
        for (KFS_StreamBase const* const child : *layout)
            if (auto const found = registered.find(child); found != registered.end()) children.push_back(found->second);
    }
    UnregisterFactoryFunc_NullOK(name, false);
    if (keep.empty()) {
        std::erase_if(
            children,
            [&](KFS_MatchName const& child) {
                KFS_StreamBase const* const canonical = GetCanonicalStream(child);
                KFS_StreamGroup const* const subgroup = canonical ? canonical->GetAsGroup() : nullptr;
                if (subgroup) UnregisterCanonicalInstanceRecursive(subgroup, keep);
                return subgroup != nullptr;
            });
    }
    for (KFS_MatchName const& child : children)
        if (!keep.contains(child)) UnregisterFactoryFunc_NullOK(child, true);
}

void KFS_StreamFactory::RegisterObsoleteStreamParent(KFS_MatchName const& obsoleteName, KFS_MatchName const& parentName)
{
    ScRecursiveLock const guard(lock_);
    obsoleteParents_.emplace(obsoleteName, parentName);
}

bool KFS_StreamFactory::GatherObsoleteReplacementStreams(KFS_StreamBase* stream, std::vector<KFS_Stream*>& result)
{
    Q_ScAutoPtr<KFS_StreamBase> replacement;
    {
        ScRecursiveLock const guard(lock_);
        auto const found = obsoleteParents_.find(stream->GetMatchName());
        if (found == obsoleteParents_.end()) return false;
        replacement.reset(CreateStream(found->second, true, 600, true, false));
    }
    result.clear();
    KFS_NamedStreamGroup* const group = replacement ? replacement->GetAsNamedGroup() : nullptr;
    if (!group) return true;
    group->UpgradeChildStream(stream);
    result.reserve(group->GetNumStreams());
    for (unsigned int i = 0; i < group->GetNumStreams(); ++i) {
        KFS_StreamBase const* const child = group->GetEditableStreamNullOK(i);
        if (child && child->IsLeaf())
            result.push_back(group->SwapCanonicalForStream(child->GetMatchName())->GetAsLeaf());
    }
    return true;
}

void KFS_ScRegisterStreams::Register(KFS_MatchName const& name, KFS_FactoryFunc const& func, bool deferLayout)
{
    names_.reserve(names_.size() + 1);
    if (factory_->RegisterFactoryFunc(name, func, deferLayout)) names_.push_back(name);
}

void KFS_ScRegisterStreams::UnregisterAll()
{
    for (; !names_.empty(); names_.pop_back()) factory_->UnregisterFactoryFunc_NullOK(names_.back(), false);
}
