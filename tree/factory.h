#pragma once

#include "frame/export.h"
#include "frame/services/memory.h"
#include "frame/services/threads.h"
#include "tree/matchname.h"

#include <boost/function.hpp>

#include <map>
#include <set>
#include <vector>

class KFS_Stream;
class KFS_StreamBase;
class KFS_StreamFactory;
class KFS_StreamGroup;

// Builds a stream of a kind; the result is the caller's. `constant` is always true.
using KFS_FactoryFunc = boost::function<KFS_StreamBase*(KFS_MatchName const& name, KFS_StreamFactory* factory,
                                                        bool constant, unsigned int timeScale, bool canonical)>;

// The registry of stream kinds: for each match name a function that builds such a stream, and one canonical instance.
//
// A canonical instance is a kind's default, made once and shared: an unedited slot of a named group points to it, it
// carries the kind's description (parameter record, display name, layout), and it is the prototype of a kind that was
// registered as an object. It has no parent and must not be edited. Streams of a kind must be gone before the kind is
// unregistered.
//
// Errors: a registration of a taken name isn't one, the first registration stands. Broken invariants throw the int 3.
// Threads: any; a lock guards the maps. A kind's function runs without the lock, except for its canonical instance.
class KFS_API KFS_StreamFactory : public Q_MemTrackedObject {
public:
    KFS_StreamFactory() = default;
    // Canonical instances that are still registered aren't deleted.
    virtual ~KFS_StreamFactory();
    KFS_StreamFactory(KFS_StreamFactory const&) = delete;
    KFS_StreamFactory& operator=(KFS_StreamFactory const&) = delete;

    // False if the name is taken. With `deferLayout` the canonical instance gets its layout by SetupCanonicalStream,
    // which the host calls once all kinds that the layout names are registered. If it throws, the name is free as before.
    bool RegisterFactoryFunc(KFS_MatchName const& name, KFS_FactoryFunc const& func, bool deferLayout);
    // True if there was such a kind; its canonical instance is deleted, and the followers of a separation leader with it. The absence of one is logged, unless `nullOK`.
    bool UnregisterFactoryFunc(KFS_MatchName const& name);
    bool UnregisterFactoryFunc_NullOK(KFS_MatchName const& name, bool nullOK);

    // A new stream, the caller's; a leaf has its default value, as a constant or as one key at time 0. An unknown kind
    // is reported and thrown as KFS_Err_UnknownStream, or gives null without `reportIfUnknown`.
    KFS_StreamBase* CreateStream(KFS_MatchName const& name, bool constant, unsigned int timeScale, bool reportIfUnknown,
                                 bool canonical);

    // Takes an object over as the canonical instance of its match name, whose streams are clones of it from then on. If
    // the name is taken the object is deleted. Returns the registered instance.
    KFS_StreamBase* RegisterCanonicalInstance(KFS_StreamBase* stream);
    bool UnregisterCanonicalInstance(KFS_StreamBase const* stream);
    // Null for an unknown name. GetCanonicalStream is the look-up that the tree uses.
    KFS_StreamBase* GetCanonicalInstance(KFS_MatchName const& name);
    KFS_StreamBase* GetCanonicalStream(KFS_MatchName const& name);
    // A clone of the canonical instance, which must exist, as a real stream.
    KFS_StreamBase* MakeInstanceFromCanonical(KFS_MatchName const& name, bool constant, unsigned int timeScale);
    // Ends a registration with `deferLayout`. The name must be registered.
    void SetupCanonicalStream(KFS_MatchName const& name);

    // Kinds whose definitions came from data files: groups, and text streams.
    void RegisterDataFileContainer(KFS_MatchName const& name);
    // Unregisters each data file's group and the children of it that aren't such groups themselves.
    void UnRegisterDataFileContainers();
    // The same for one group. With an empty `keep` it goes down into its subgroups; else kinds named in `keep` stay.
    void UnregisterCanonicalMatchName(KFS_MatchName const& name, std::set<KFS_MatchName> const& keep);
    std::set<KFS_MatchName> GetDataFileMatchNames() const;
    void RegisterDataFileTextStream(KFS_MatchName const& name);
    bool IsDataFileTextStream(KFS_MatchName const& name) const;
    void UnRegisterDataFileTextStreams();

    // Says which group replaces an obsolete kind of stream. The first registration of a kind stands.
    void RegisterObsoleteStreamParent(KFS_MatchName const& obsoleteName, KFS_MatchName const& parentName);
    // Converts an obsolete stream, which stays the caller's, into the streams that replace it. They are the caller's.
    // False, with `result` untouched, if the stream's kind isn't obsolete.
    bool GatherObsoleteReplacementStreams(KFS_StreamBase* stream, std::vector<KFS_Stream*>& result);

    // Separated dimensions (keystore/separation.h). The first is called for a leader's kind that is being registered: makes
    // and registers the canonical followers. The second puts the followers of each leader in a layout directly behind it; the
    // leaders must be registered. The third unregisters a leader's followers.
    void RegisterSeparatedDimensions(KFS_Stream const* leader);
    void SetupCanonicalLayoutForSeperatedDimensions(
        std::vector<KFS_StreamBase const*, Q_Allocator<KFS_StreamBase const*>>* layout);
    void UnregisterSeperationMapEntry(std::pair<KFS_MatchName const, std::vector<KFS_StreamBase*>> const& entry);

    void DebugRegisterStream(KFS_MatchName const&, KFS_MatchName const&) {}
    void DebugUnregisterStream(KFS_MatchName const&, hearth::threads::ScRecursiveLock const&) {}

private:
    std::map<KFS_StreamBase const*, KFS_MatchName> GetNamesOfInstances() const;
    void UnregisterFollowers(KFS_MatchName const& leader);
    void UnregisterCanonicalInstanceRecursive(KFS_StreamGroup const* group, std::set<KFS_MatchName> const& keep);

    std::set<KFS_MatchName> dataFileContainers_;
    std::set<KFS_MatchName> dataFileTextStreams_;
    std::map<KFS_MatchName, KFS_FactoryFunc> factoryFuncs_;
    std::map<KFS_MatchName, KFS_StreamBase*> canonicalInstances_;          // owned
    std::map<KFS_MatchName, std::vector<KFS_StreamBase*>> separationMap_;  // a leader's canonical followers
    std::map<KFS_MatchName, KFS_MatchName>
        obsoleteParents_;  // an obsolete kind's name to that of the group that replaces it
    mutable hearth::threads::RecursiveMutex lock_{"KFS_StreamFactory"};
};

// A batch of kinds that a host registers together. Going out of scope leaves them registered.
class KFS_API KFS_ScRegisterStreams {
public:
    explicit KFS_ScRegisterStreams(KFS_StreamFactory* factory) : factory_(factory) {}
    KFS_ScRegisterStreams(KFS_ScRegisterStreams const&) = delete;
    KFS_ScRegisterStreams& operator=(KFS_ScRegisterStreams const&) = delete;

    // A taken name doesn't become part of the batch.
    void Register(KFS_MatchName const& name, KFS_FactoryFunc const& func, bool deferLayout);
    bool IsRegistered(KFS_MatchName const& name) const { return factory_->GetCanonicalInstance(name) != nullptr; }
    // With keys, real, at 600 units a second.
    KFS_StreamBase* CreateStream(KFS_MatchName const& name)
    {
        return factory_->CreateStream(name, false, 600, true, false);
    }
    // The last registered first.
    void UnregisterAll();

private:
    std::vector<KFS_MatchName> names_;
    KFS_StreamFactory* factory_;
};
