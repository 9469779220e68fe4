#pragma once

#include "frame/export.h"
#include "frame/services/identifiers.h"
#include "frame/services/strings.h"
#include "frame/services/time.h"
#include "overrides/streamoverride.h"

#include <boost/shared_ptr.hpp>
#include <boost/thread/mutex.hpp>

#include <atomic>
#include <map>
#include <memory>
#include <vector>

// A set of overrides handed to an evaluation, at most one a stream. Streams are told apart by their capsule identifier
// (KFS_StreamBase::GetStreamCapsuleData), so an override also finds the same stream in a clone of its tree. Copies share
// the overrides.
//
// A bag's GUID stands for its content: two bags with one GUID are the same bag. It is computed when first asked for and
// kept until the bag changes. It covers addresses, so it means nothing in another process and must not be saved.
//
// Threads: any number of readers, GetGUID included, while nobody changes the bag; a shared bag isn't changed.
class KFS_API KFS_ParamBag {
public:
    // Costs nothing: what a bag holds, its mutex included, is made with the first override. So the copies of bags with
    // something in them, and AddOverride, throw boost::thread_resource_error where there is no mutex to be had.
    KFS_ParamBag() = default;
    KFS_ParamBag(KFS_ParamBag const& source);
    // The union of both; where both hold an override for one stream, `a` wins.
    KFS_ParamBag(KFS_ParamBag const& a, KFS_ParamBag const& b);
    KFS_ParamBag& operator=(KFS_ParamBag const& source);
    // Exchanges the two, without memory: so a scope can always give a bag its content back.
    KFS_ParamBag& operator=(KFS_ParamBag&& source) noexcept;
    virtual ~KFS_ParamBag();

    // Forgets the GUID. For those who have changed an override in place before sharing it.
    void SetDirty() const;
    hearth::utility::Guid GetGUID() const;

    // Takes the place of an earlier override for the same stream. Neither pointer may be null.
    void AddOverride(KFS_StreamBase const* stream, boost::shared_ptr<KFS_StreamOverride> streamOverride);
    void Clear();

    bool StreamOverridden(KFS_StreamBase const* stream) const { return Find(stream) != nullptr; }
    // The override's value at a time; false, and `value` is left alone, where there is none. `value` must not be null.
    // Lets through what a value function throws.
    bool StreamOverridden(KFS_StreamBase const* stream, T_Time const& time, KFS_OverrideValue* value) const;
    // The override itself, owned by the bag; false, and `streamOverride` is left alone, where there is none.
    bool GetStreamOverride(KFS_StreamBase const* stream, KFS_StreamOverride const** streamOverride) const;

    bool IsEmpty() const { return !content_ || content_->overrides.empty(); }
    unsigned int GetOverrideCount() const
    {
        return content_ ? static_cast<unsigned int>(content_->overrides.size()) : 0;
    }
    // Whether no override has a value function.
    bool IsTimeInvariant() const;

    bool operator==(KFS_ParamBag const& other) const { return GetGUID() == other.GetGUID(); }
    bool operator!=(KFS_ParamBag const& other) const { return !(*this == other); }
    // -1, 0 or 1, by GUID.
    int GetSortOrder(KFS_ParamBag const& other) const;
    // Those overrides of `other` whose stream has a different one here; with `effectsOnly` only those for effect
    // streams. A stream that only one of the two bags overrides makes no difference. In the order of the identifiers.
    std::vector<boost::shared_ptr<KFS_StreamOverride>> FindRightySymmetricDifference(KFS_ParamBag const& other,
                                                                                     bool effectsOnly) const;

private:
    using Overrides = std::map<u16str, boost::shared_ptr<KFS_StreamOverride>>;
    // An override by the hash of its stream's identifier.
    struct Named {
        unsigned int hash;
        Overrides::value_type const* entry;
    };

    struct Content {
        Overrides overrides;
        // All of them, sorted by hash: nearly all streams that are read aren't named, and are told so by this; of one that
        // is a single identifier is compared.
        std::vector<Named> index;
        hearth::utility::Guid guid;
        boost::mutex lock;  // guards guid and the way of dirty to false
        std::atomic<bool> dirty{true};
    };

    KFS_StreamOverride const* Find(KFS_StreamBase const* stream) const;
    void FillIndex();
    void ComputeGuid() const;

    std::unique_ptr<Content> content_;  // null until something is put in
};

// Two bags as one, for a scope: the union only where both have something to say, else whichever has, without a copy.
// Both must outlive the helper.
class KFS_API KFS_MergedParamBagHelper {
public:
    // Either may be null. `a` wins.
    KFS_MergedParamBagHelper(KFS_ParamBag const* a, KFS_ParamBag const* b);
    // Null only if both were.
    KFS_ParamBag const* Get() const { return bag_; }

private:
    KFS_ParamBag const* bag_;
    std::shared_ptr<KFS_ParamBag> merged_;
};
