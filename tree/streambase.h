#pragma once

#include "frame/export.h"
#include "frame/services/identifiers.h"
#include "frame/services/memory.h"
#include "frame/services/strings.h"
#include "frame/services/threads.h"
#include "tree/matchname.h"
#include "tree/paramdef.h"
#include "tree/streampath.h"

#include <boost/any.hpp>

#include <atomic>
#include <set>
#include <vector>

class GetRenderGuidFilter;
class KFS_ClientRefCon;
class KFS_IndexedStreamGroup;
class KFS_NamedStreamGroup;
class KFS_Project;
class KFS_RenderOptionsBase;
class KFS_Stream;
class KFS_StreamFactory;
class KFS_StreamGroup;
struct CKF_ChunkInfo;
struct CKF_File;

// What a clone of a stream takes along.
struct KFS_CloneStreamParams {
    bool cloneKeys;
    bool cloneExpression;
};

// Bits of a node's flag word. All but Canonical change through the virtual SetStreamBaseFlags, which notifies.
enum KFS_BaseFlag : unsigned int {
    KFS_BaseFlag_Active = 0x00000001,
    KFS_BaseFlag_Hidden = 0x00000002,
    KFS_BaseFlag_Canonical = 0x00000004,  // the shared default instance of its match name; must not be edited
    KFS_BaseFlag_ShowActiveSwitch = 0x00000008,
    KFS_BaseFlag_Disabled = 0x00000010,
    KFS_BaseFlag_Elided = 0x00000020,
    KFS_BaseFlag_Independent = 0x00000040,  // the value stands by itself, without the application's context around it
    KFS_BaseFlag_SkipLeafRead = 0x00000080,
    KFS_BaseFlag_Reserved8 = 0x00000100,
    KFS_BaseFlag_MarkedGraph = 0x00000200,
    KFS_BaseFlag_ShownWhenEmpty = 0x00000400,
    KFS_BaseFlag_DimensionsSeparated = 0x00000800,
    KFS_BaseFlag_AffectsRenderingWhenHidden = 0x00001000,
    KFS_BaseFlag_DimensionsUnconstrained = 0x00002000,  // stored inverted: a new stream is constrained
    KFS_BaseFlag_Boolean3Way = 0x00004000,
    KFS_BaseFlag_DisplayNameIncludesParent = 0x00008000,
    KFS_BaseFlag_SkipReveal = 0x00010000,
    KFS_BaseFlag_AddedDStream = 0x00020000,
    KFS_BaseFlag_NamesSameInitted = 0x00040000,
    KFS_BaseFlag_NamesSame = 0x00080000,
};

// What ProbeListenerState answers and a node remembers.
enum KFS_ListenerState : int {
    KFS_ListenerState_Unknown = 0,
    KFS_ListenerState_Heard = 1,
    KFS_ListenerState_Silent = 2,
};

// What identifies a stream among all streams of an application, in a form that survives outside the process.
struct KFS_API KFS_StreamCapsuleData {
    KFS_StreamIDPath path;  // from the stream's root; empty on a canonical instance
    u16str id;              // the root's identifier followed by the path as JSON; a canonical instance's match name
};

// Any node of a stream tree: a leaf (KFS_Stream) or an interior node (KFS_StreamGroup). It knows its name, its flags,
// its parent and its factory; it doesn't own its children, and its destructor doesn't detach it from its parent.
//
// A node is either canonical, the factory's shared default instance of its match name, or a real instance that belongs
// to one tree.
//
// The virtual operations' order is part of the binary interface: hosts derive from this class.
//
// Threads: structure and flags change on one thread at a time, by contract with the host. The getters that fill a value
// on demand (display name, 16-bit match name, capsule data, host value) are safe under concurrent readers.
class KFS_API KFS_StreamBase : public Q_MemTrackedObject {
public:
    virtual ~KFS_StreamBase();

    // A new stream that the caller owns.
    virtual KFS_StreamBase* CloneStream(KFS_CloneStreamParams const& params) const = 0;
    // CloneStream with both parameters set to `keysAndExpression`.
    virtual KFS_StreamBase* Clone(bool keysAndExpression) const;
    virtual u16str GetCapsuleStreamID() const;
    // The name under which a file of an older version knows this stream.
    virtual KFS_MatchName GetMatchNameOverrideForSave(CKF_File const* file) const;
    virtual bool IsModified() const;
    virtual bool IsAnimated(bool evenIfDisabled) const = 0;
    virtual bool IsGroup() const;
    virtual bool IsNamedGroup() const;
    virtual bool IsIndexedGroup() const;
    virtual bool IsLeaf() const;
    virtual bool IsFloatBased() const;
    virtual bool IsLoading() const;
    // Whether listeners hear this stream (KFS_ListenerState). Asked once, then remembered for the stream's life; a
    // stream without a parent stays unknown. A root that can be heard overrides this and answers Heard.
    virtual int ProbeListenerState();
    // The tree's own casts: null for the wrong kind.
    virtual KFS_Stream* GetAsLeaf();
    virtual KFS_Stream const* GetAsLeaf() const;
    virtual KFS_StreamGroup* GetAsGroup();
    virtual KFS_StreamGroup const* GetAsGroup() const;
    virtual KFS_IndexedStreamGroup const* GetAsIndexedGroup() const;
    virtual KFS_IndexedStreamGroup* GetAsIndexedGroup();
    virtual KFS_NamedStreamGroup const* GetAsNamedGroup() const;
    virtual KFS_NamedStreamGroup* GetAsNamedGroup();
    // The root's answer; null without a parent. A root overrides it.
    virtual KFS_Project* GetProject() const;
    // The new word is (value & mask) | (old & ~mask); listeners hear of it if it differs.
    virtual void SetStreamBaseFlags(unsigned int value, unsigned int mask);
    virtual bool GetHideDimensionLock() const;
    virtual bool GetScaleBasedConstrainment() const;
    virtual bool AreDimensionsSeparated() const;
    virtual void SetDimensionsSeparated(bool separated);
    virtual bool IsBoolean3Way() const;
    virtual bool SkipReveal() const;
    virtual bool DisplayNameIncludesParent() const;
    virtual bool AffectsRendering(KFS_RenderOptionsBase const& options) const = 0;
    virtual hearth::utility::Guid GetRenderGuid(KFS_RenderOptionsBase const& options,
                                                GetRenderGuidFilter* filter) const = 0;
    virtual bool CanDisplayPostExpressionValue() const;
    virtual void Read(CKF_File* file, CKF_ChunkInfo const* chunk);
    virtual bool ShouldWriteForVersion(CKF_File const* file) const;
    virtual void Write(CKF_File* file) const;
    virtual void MakeIndependent(bool independent);
    virtual u16str GetEnglishDisplayName() const;
    // Throws std::logic_error here; a class with a dynamic English name overrides it.
    virtual void SetEnglishDisplayName(u16str const& name);
    virtual void GetExpressionDependencyIds(std::set<int>& ids) const;
    virtual void SetupCanonicalLayout();
    // Fills the parameter record. The base leaves paramType at FX_Param_NotFilledIn.
    virtual void FillInParamDef() const;
    // A subclass assigns its display name here, with pSetDisplayName.
    virtual void FillInDisplayName() const;

    // Called by KFS_Birth and KFS_Death.
    [[nodiscard]] static int Birth();
    [[nodiscard]] static int Death();

    KFS_MatchName const& GetMatchName() const { return matchName_; }
    void SetMatchName(KFS_MatchName const& name);
    u16str const& GetMatchName16Str() const;
    u16str const& GetDisplayName() const;
    void SetDisplayName(u16str const& name);
    // Without a notification: what FillInDisplayName uses.
    void pSetDisplayName(u16str const& name) const;
    // Remembers its answer in two flag bits, so it notifies of a change of flags although it is const.
    bool IsMatchNameSameAsDisplayName() const;

    KFS_StreamFactory* GetFactory() const { return factory_; }
    KFS_StreamGroup* GetParent() { return parent_; }
    KFS_StreamGroup const* GetParent() const { return parent_; }
    // Stores the parent; then tells the ancestors and takes each non-canonical leaf to the group's preferred time
    // scale. Throws the rescale's code, with the parent already set.
    void SetParent(KFS_StreamGroup* group);
    // The topmost ancestor; null without a parent: a root isn't its own root.
    KFS_StreamGroup* GetRoot();
    KFS_StreamGroup const* GetRoot() const;
    // `depth`, if given, gets the number of steps up to `group`, 1 for the parent.
    bool IsChildOf(KFS_StreamGroup const* group, unsigned int* depth) const;
    bool AreAllParentsActive() const;
    bool IsHiddenByAncestor() const;
    // Whether the stream takes part in a render's identity: it isn't hidden (or counts all the same), is active or
    // overridden, and AffectsRendering.
    bool IncludeInGuidComputation(KFS_RenderOptionsBase const& options) const;
    bool IsNotAnimated(bool evenIfDisabled) const { return !IsAnimated(evenIfDisabled); }

    // The path to this node, and in `root` its topmost ancestor, the node itself if it has no parent; null if that is a
    // leaf. Slow, because an indexed group searches for each child. `root` and `path` must not be null.
    void SlowGetPathFromRootToMe(KFS_StreamGroup** root, KFS_StreamIDPath* path);
    void SlowGetPathFromRootToMe(KFS_StreamGroup const** root, KFS_StreamIDPath* path) const;
    // Of the place that the node has when first asked: the answer is kept and doesn't follow the node through the tree.
    KFS_StreamCapsuleData const& GetStreamCapsuleData() const;
    // A hash of the identifier in it, never 0: what tells most streams apart without a lock and without a string. Means
    // nothing outside the process.
    unsigned int GetStreamCapsuleHash() const
    {
        unsigned int const known = capsuleHash_.load(std::memory_order_acquire);
        return known != 0 ? known : ComputeCapsuleHash();
    }

    // These ask the factory. Without one they are a broken invariant: reported, and the int 3 thrown.
    KFS_StreamBase* CreateStream(KFS_MatchName const& name, bool constant, unsigned int timeScale, bool reportIfUnknown,
                                 bool canonical);
    KFS_StreamBase* GetCanonicalStream(KFS_MatchName const& name) const;
    void RegisterObsoleteStreamParent(KFS_MatchName const& obsoleteName, KFS_MatchName const& parentName);
    // For this stream, as it was read from an old project.
    bool GatherObsoleteReplacementStreams(std::vector<KFS_Stream*>& replacements);

    FX_ParamDef& GetParamDef();
    FX_ParamDef const& GetParamDef() const;
    void SetParamDef(FX_ParamDef const& def);
    void pSetParamDef(FX_ParamDef const& def) const;
    void DeepCopyParamDef(FX_ParamDef const& def) const;

    // A copy of the host's opaque value. A real stream inherits its canonical instance's on first demand.
    boost::any GetSMDataPath() const;
    // Takes no lock.
    void SetSMDataPath(boost::any value);

    KFS_ClientRefCon* GetRefCon() const { return refCon_; }
    void SetRefCon(KFS_ClientRefCon* refCon) const { refCon_ = refCon; }

    unsigned int GetStreamBaseFlags() const { return flags_; }
    int GetListenerState() const { return listenerState_; }

    bool IsActive() const { return HasFlag(KFS_BaseFlag_Active); }
    void SetActive(bool on) { SetFlag(KFS_BaseFlag_Active, on); }
    bool IsHidden() const { return HasFlag(KFS_BaseFlag_Hidden); }
    void SetHidden(bool on) { SetFlag(KFS_BaseFlag_Hidden, on); }
    bool IsCanonical() const { return HasFlag(KFS_BaseFlag_Canonical); }
    // Writes the bit directly, with no notification.
    void SetCanonical(bool on);
    bool IsShowingActiveSwitch() const { return HasFlag(KFS_BaseFlag_ShowActiveSwitch); }
    void ShowActiveSwitch(bool on) { SetFlag(KFS_BaseFlag_ShowActiveSwitch, on); }
    bool IsDisabled() const { return HasFlag(KFS_BaseFlag_Disabled); }
    void SetDisabled(bool on) { SetFlag(KFS_BaseFlag_Disabled, on); }
    bool IsElided() const { return HasFlag(KFS_BaseFlag_Elided); }
    void SetElided(bool on) { SetFlag(KFS_BaseFlag_Elided, on); }
    bool IsIndependent() const { return HasFlag(KFS_BaseFlag_Independent); }
    bool IsMarkedGraph() const { return HasFlag(KFS_BaseFlag_MarkedGraph); }
    void SetMarkedGraph(bool on) { SetFlag(KFS_BaseFlag_MarkedGraph, on); }
    bool IsShownWhenEmpty() const { return HasFlag(KFS_BaseFlag_ShownWhenEmpty); }
    void SetShownWhenEmpty(bool on) { SetFlag(KFS_BaseFlag_ShownWhenEmpty, on); }
    bool AffectsRenderingWhenHidden() const { return HasFlag(KFS_BaseFlag_AffectsRenderingWhenHidden); }
    void SetAffectsRenderingWhenHidden(bool on) { SetFlag(KFS_BaseFlag_AffectsRenderingWhenHidden, on); }
    bool AreDimensionsConstrained() const { return !HasFlag(KFS_BaseFlag_DimensionsUnconstrained); }
    void SetDimensionsConstrained(bool on) { SetFlag(KFS_BaseFlag_DimensionsUnconstrained, !on); }
    bool IsAddedDStream() const { return HasFlag(KFS_BaseFlag_AddedDStream); }
    void SetAddedDStream(bool on) { SetFlag(KFS_BaseFlag_AddedDStream, on); }
    bool NamesSameInitted() const { return HasFlag(KFS_BaseFlag_NamesSameInitted); }
    void SetNamesSameInitted(bool on) { SetFlag(KFS_BaseFlag_NamesSameInitted, on); }
    bool NamesSame() const { return HasFlag(KFS_BaseFlag_NamesSame); }
    void SetNamesSame(bool on) { SetFlag(KFS_BaseFlag_NamesSame, on); }

    // Exchanges name, flags, parameter record and display name; all else stays in its place, the parent too.
    void SwapBase(KFS_StreamBase& other);

    void DebugLog(char const*) const {}

    KFS_StreamBase& operator=(KFS_StreamBase const&) = delete;

protected:
    // `name` may be null. `factory` isn't owned.
    KFS_StreamBase(KFS_MatchName const* name, KFS_StreamFactory* factory, bool canonical);
    // The copy has no parent, no client pointer and nothing of what is filled in on demand but the display name.
    KFS_StreamBase(KFS_StreamBase const& source);

private:
    friend class KFS_StreamGroup;  // gives a clone's children their parent

    bool HasFlag(KFS_BaseFlag flag) const { return (flags_ & flag) != 0; }
    void SetFlag(KFS_BaseFlag flag, bool on) { SetStreamBaseFlags(on ? flag : 0U, flag); }
    unsigned int ComputeCapsuleHash() const;

    KFS_MatchName matchName_;
    unsigned int flags_;
    KFS_StreamGroup* parent_ = nullptr;
    int listenerState_ = KFS_ListenerState_Unknown;
    mutable std::atomic<unsigned int> capsuleHash_{0};  // set once capsuleData_ won't change any more
    mutable FX_ParamDef paramDef_{};
    KFS_StreamFactory* factory_;
    mutable u16str displayName_;
    mutable u16str matchName16_;
    mutable KFS_ClientRefCon* refCon_ = nullptr;
    mutable KFS_StreamCapsuleData capsuleData_;
    mutable boost::any smDataPath_;
    // Guards displayName_, matchName16_, capsuleData_ and smDataPath_. Whoever holds it may take an ancestor's or the
    // factory's.
    mutable hearth::threads::RecursiveMutex lock_{nullptr};
};

// Holds a stream independent, or not, for a scope.
class KFS_API KFS_ScSetResetIndependent {
public:
    KFS_ScSetResetIndependent(KFS_StreamBase* stream, bool wanted);
    ~KFS_ScSetResetIndependent();
    KFS_ScSetResetIndependent(KFS_ScSetResetIndependent const&) = delete;
    KFS_ScSetResetIndependent& operator=(KFS_ScSetResetIndependent const&) = delete;

private:
    KFS_StreamBase* stream_;
    bool saved_;
};
