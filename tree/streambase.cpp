#include "tree/streambase.h"

#include "frame/boundary_private.h"
#include "tree/factory.h"
#include "tree/leafhooks_private.h"
#include "tree/listener_private.h"
#include "tree/streambase_private.h"
#include "tree/streamgroup.h"
#include "tree/verify_private.h"

#include <cstring>
#include <exception>
#include <stdexcept>
#include <utility>

using hearth::threads::ScRecursiveLock;

namespace {

// Every question about kinds goes to the factory, so a node without one can't answer it.
KFS_StreamFactory* Required(KFS_StreamFactory* factory)
{
    if (!factory) KFSp_FailVerification("asked a property without a factory for a property type");
    return factory;
}

// Ends a run of paths in a file.
constexpr char const* EndOfPathText = "ZQVM End of path sentinel";

// Takes a leaf that has just found its place to the scale there.
struct KFSp_RescaleNewlyInstalledStream {
    unsigned int scale;
    void operator()(KFS_Stream* leaf) const { KFSp_Rescale(leaf, scale); }
};

}  // namespace

static KFS_MatchName* S_KFS_EndOfIDPathSentinelMatchName = nullptr;

int KFS_StreamBase::Birth()
{
    XLOG_Log(10, "KFS", "Birth", "KFS StreamBase Birth");
    return KFSp_Boundary([] {
        S_KFS_EndOfIDPathSentinelMatchName = new KFS_MatchName(EndOfPathText, true);
        KFSp_MakeMainListenerManager();
    });
}

int KFS_StreamBase::Death()
{
    XLOG_Log(10, "KFS", "Death", "KFS StreamBase Death");
    KFSp_DestroyMainListenerManager();
    delete std::exchange(S_KFS_EndOfIDPathSentinelMatchName, nullptr);
    return 0;
}

KFS_MatchName const& KFSp_GetEndOfIDPathSentinelMatchName()
{
    return *S_KFS_EndOfIDPathSentinelMatchName;
}

KFS_StreamBase::KFS_StreamBase(KFS_MatchName const* name, KFS_StreamFactory* factory, bool canonical)
    : flags_(KFS_BaseFlag_Active | (canonical ? KFS_BaseFlag_Canonical : 0U)),
      factory_(factory)
{
    if (name) matchName_ = *name;
    KFS_StreamBase::FillInParamDef();
}

KFS_StreamBase::KFS_StreamBase(KFS_StreamBase const& source)
    : matchName_(source.matchName_),
      flags_(source.flags_),
      listenerState_(source.listenerState_),
      factory_(source.factory_),
      displayName_(source.displayName_)
{
    FX_ParamDef_Copy(source.paramDef_, &paramDef_);
}

KFS_StreamBase::~KFS_StreamBase()
{
    try {
        KFSp_Notify(
            this, [this](KFS_StreamListener* listener) { listener->StreamDestroyed(this); });
    } catch (int) {
        // A listener's failure doesn't keep a stream alive.
    } catch (std::exception& exception) {
        static_cast<void>(Q_TranslateAndReportException(exception));
    } catch (...) {
        std::terminate();
    }
    KFS_DeleteParamDefInternalString(&paramDef_);
}

KFS_StreamBase* KFS_StreamBase::Clone(bool keysAndExpression) const
{
    return CloneStream(KFS_CloneStreamParams{keysAndExpression, keysAndExpression});
}

u16str KFS_StreamBase::GetCapsuleStreamID() const
{
    return GetMatchName16Str();
}

KFS_MatchName KFS_StreamBase::GetMatchNameOverrideForSave(CKF_File const*) const
{
    return matchName_;
}

bool KFS_StreamBase::IsModified() const
{
    return false;
}

bool KFS_StreamBase::IsGroup() const
{
    return false;
}

bool KFS_StreamBase::IsNamedGroup() const
{
    return false;
}

bool KFS_StreamBase::IsIndexedGroup() const
{
    return false;
}

bool KFS_StreamBase::IsLeaf() const
{
    return false;
}

bool KFS_StreamBase::IsFloatBased() const
{
    return false;
}

bool KFS_StreamBase::IsLoading() const
{
    return false;
}

int KFS_StreamBase::ProbeListenerState()
{
    if (listenerState_ != KFS_ListenerState_Unknown) return listenerState_;
    if (IsCanonical()) {
        listenerState_ = KFS_ListenerState_Silent;
        return listenerState_;
    }
    KFS_StreamGroup* const root = GetRoot();
    if (!root) return KFS_ListenerState_Unknown;
    listenerState_ = root->ProbeListenerState();
    return listenerState_;
}

KFS_Stream* KFS_StreamBase::GetAsLeaf()
{
    return nullptr;
}

KFS_Stream const* KFS_StreamBase::GetAsLeaf() const
{
    return nullptr;
}

KFS_StreamGroup* KFS_StreamBase::GetAsGroup()
{
    return nullptr;
}

KFS_StreamGroup const* KFS_StreamBase::GetAsGroup() const
{
    return nullptr;
}

KFS_IndexedStreamGroup const* KFS_StreamBase::GetAsIndexedGroup() const
{
    return nullptr;
}

KFS_IndexedStreamGroup* KFS_StreamBase::GetAsIndexedGroup()
{
    return nullptr;
}

KFS_NamedStreamGroup const* KFS_StreamBase::GetAsNamedGroup() const
{
    return nullptr;
}

KFS_NamedStreamGroup* KFS_StreamBase::GetAsNamedGroup()
{
    return nullptr;
}

KFS_Project* KFS_StreamBase::GetProject() const
{
    KFS_StreamGroup const* const root = GetRoot();
    return root ? root->GetProject() : nullptr;
}

void KFS_StreamBase::SetStreamBaseFlags(unsigned int value, unsigned int mask)
{
    unsigned int const oldFlags = flags_;
    flags_ = (value & mask) | (oldFlags & ~mask);
    unsigned int const newFlags = flags_;
    if (newFlags != oldFlags) {
        KFSp_Notify(
            this, [this, oldFlags,
                   newFlags](KFS_StreamListener* listener) { listener->StreamFlagsChanged(this, oldFlags, newFlags); });
    }
}

bool KFS_StreamBase::GetHideDimensionLock() const
{
    return false;
}

bool KFS_StreamBase::GetScaleBasedConstrainment() const
{
    return false;
}

bool KFS_StreamBase::AreDimensionsSeparated() const
{
    return false;
}

void KFS_StreamBase::SetDimensionsSeparated(bool) {}

bool KFS_StreamBase::IsBoolean3Way() const
{
    return HasFlag(KFS_BaseFlag_Boolean3Way);
}

bool KFS_StreamBase::SkipReveal() const
{
    return HasFlag(KFS_BaseFlag_SkipReveal);
}

bool KFS_StreamBase::DisplayNameIncludesParent() const
{
    return HasFlag(KFS_BaseFlag_DisplayNameIncludesParent);
}

bool KFS_StreamBase::CanDisplayPostExpressionValue() const
{
    return false;
}

bool KFS_StreamBase::ShouldWriteForVersion(CKF_File const*) const
{
    return true;
}

void KFS_StreamBase::MakeIndependent(bool independent)
{
    SetFlag(KFS_BaseFlag_Independent, independent);
}

u16str KFS_StreamBase::GetEnglishDisplayName() const
{
    return {};
}

void KFS_StreamBase::SetEnglishDisplayName(u16str const&)
{
    throw std::logic_error("Insert KFS_DynamicEnglishDisplayName<> into your heirarchy");
}

void KFS_StreamBase::GetExpressionDependencyIds(std::set<int>&) const {}

void KFS_StreamBase::SetupCanonicalLayout() {}

// Of a stream that nobody describes the record is asked for again at each question, by readers side by side too: as long
// as it says nothing it isn't written.
void KFS_StreamBase::FillInParamDef() const
{
    FX_ParamDef def{};
    def.paramType = FX_Param_NotFilledIn;
    FX_ParamDef const& now = paramDef_;
    bool const isBlank = now.paramType == def.paramType && now.paramFlags == 0 && now.reservedA == 0 &&
                         now.reservedWord == 0 && now.reservedB == 0 &&
                         std::memcmp(now.name, def.name, sizeof def.name) == 0 &&
                         std::memcmp(&now.value, &def.value, sizeof def.value) == 0;
    if (!isBlank) FX_ParamDef_Copy(def, &paramDef_);
}

void KFS_StreamBase::FillInDisplayName() const {}

void KFS_StreamBase::SetMatchName(KFS_MatchName const& name)
{
    matchName_ = name;
    matchName16_.clear();
    SetNamesSameInitted(false);
}

u16str const& KFS_StreamBase::GetMatchName16Str() const
{
    ScRecursiveLock const guard(lock_);
    if (matchName16_.empty()) {
        if (unsigned char const* const text = matchName_.GetName()) matchName16_ = Q_MatchNameToUTF16String(text);
    }
    return matchName16_;
}

u16str const& KFS_StreamBase::GetDisplayName() const
{
    ScRecursiveLock const guard(lock_);
    if (displayName_.empty()) FillInDisplayName();
    return displayName_;
}

void KFS_StreamBase::SetDisplayName(u16str const& name)
{
    displayName_ = name;
    SetNamesSameInitted(false);
    KFSp_Notify(this, [this](KFS_StreamListener* listener) { listener->StreamDisplayNameChanged(this); });
}

void KFS_StreamBase::pSetDisplayName(u16str const& name) const
{
    // A name that stays empty is filled in again by each reader, beside others who look at it.
    if (displayName_ != name) displayName_ = name;
    // In the word itself, since a name that is filled in on demand is no news to listeners; and only where the bit is
    // set, since readers fill names in beside other readers of the word.
    if (NamesSameInitted())
        const_cast<KFS_StreamBase*>(this)->flags_ &= ~static_cast<unsigned int>(KFS_BaseFlag_NamesSameInitted);
}

bool KFS_StreamBase::IsMatchNameSameAsDisplayName() const
{
    if (NamesSameInitted()) return NamesSame();
    bool const same = GetMatchName16Str() == GetDisplayName();
    auto* const self = const_cast<KFS_StreamBase*>(this);
    self->SetNamesSame(same);
    self->SetNamesSameInitted(true);
    return same;
}

void KFS_StreamBase::SetParent(KFS_StreamGroup* group)
{
    parent_ = group;
    if (!group) return;
    group->NotifyParentsStreamStored(this);
    // Canonical leaves below stay at their own scale.
    KFSp_RescaleNewlyInstalledStream const rescale{group->GetPreferredTimeScale()};
    if (KFS_Stream* const leaf = GetAsLeaf())
        rescale(leaf);
    else if (KFS_StreamGroup* const self = GetAsGroup())
        self->ForEachNonCanonicalLeafStream(rescale, nullptr);
}

KFS_StreamGroup* KFS_StreamBase::GetRoot()
{
    return const_cast<KFS_StreamGroup*>(std::as_const(*this).GetRoot());
}

KFS_StreamGroup const* KFS_StreamBase::GetRoot() const
{
    KFS_StreamGroup const* top = parent_;
    while (top && top->GetParent()) top = top->GetParent();
    return top;
}

bool KFS_StreamBase::IsChildOf(KFS_StreamGroup const* group, unsigned int* depth) const
{
    unsigned int steps = 0;
    for (KFS_StreamGroup const* node = parent_; node; node = node->GetParent()) {
        ++steps;
        if (node == group) {
            if (depth) *depth = steps;
            return true;
        }
    }
    return false;
}

bool KFS_StreamBase::AreAllParentsActive() const
{
    for (KFS_StreamGroup const* node = parent_; node; node = node->GetParent())
        if (!node->IsActive()) return false;
    return true;
}

bool KFS_StreamBase::IsHiddenByAncestor() const
{
    for (KFS_StreamBase const* node = this; node; node = node->GetParent())
        if (node->IsHidden()) return true;
    return false;
}

KFS_StreamBase* KFS_StreamBase::CreateStream(KFS_MatchName const& name, bool constant, unsigned int timeScale,
                                             bool reportIfUnknown, bool canonical)
{
    return Required(factory_)->CreateStream(name, constant, timeScale, reportIfUnknown, canonical);
}

KFS_StreamBase* KFS_StreamBase::GetCanonicalStream(KFS_MatchName const& name) const
{
    return Required(factory_)->GetCanonicalStream(name);
}

void KFS_StreamBase::RegisterObsoleteStreamParent(KFS_MatchName const& obsoleteName, KFS_MatchName const& parentName)
{
    Required(factory_)->RegisterObsoleteStreamParent(obsoleteName, parentName);
}

bool KFS_StreamBase::GatherObsoleteReplacementStreams(std::vector<KFS_Stream*>& replacements)
{
    return Required(factory_)->GatherObsoleteReplacementStreams(this, replacements);
}

FX_ParamDef& KFS_StreamBase::GetParamDef()
{
    if (paramDef_.paramType == FX_Param_NotFilledIn) FillInParamDef();
    return paramDef_;
}

FX_ParamDef const& KFS_StreamBase::GetParamDef() const
{
    return const_cast<KFS_StreamBase*>(this)->GetParamDef();
}

void KFS_StreamBase::SetParamDef(FX_ParamDef const& def)
{
    FX_ParamDef_Copy(def, &paramDef_);
}

void KFS_StreamBase::pSetParamDef(FX_ParamDef const& def) const
{
    FX_ParamDef_Copy(def, &paramDef_);
}

void KFS_StreamBase::DeepCopyParamDef(FX_ParamDef const& def) const
{
    FX_ParamDef_Copy(def, &paramDef_);
}

boost::any KFS_StreamBase::GetSMDataPath() const
{
    ScRecursiveLock const guard(lock_);
    if (smDataPath_.empty() && !IsCanonical() && factory_) {
        if (KFS_StreamBase const* const canonical = GetCanonicalStream(matchName_))
            smDataPath_ = canonical->GetSMDataPath();
    }
    return smDataPath_;
}

void KFS_StreamBase::SetSMDataPath(boost::any value)
{
    smDataPath_ = std::move(value);
}

void KFS_StreamBase::SetCanonical(bool on)
{
    flags_ = on ? flags_ | KFS_BaseFlag_Canonical : flags_ & ~static_cast<unsigned int>(KFS_BaseFlag_Canonical);
}

void KFS_StreamBase::SwapBase(KFS_StreamBase& other)
{
    std::swap(matchName_, other.matchName_);
    std::swap(flags_, other.flags_);
    std::swap(paramDef_, other.paramDef_);  // with the text that it owns
    std::swap(displayName_, other.displayName_);
}
