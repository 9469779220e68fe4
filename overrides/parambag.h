#pragma once

#include "frame/export.h"
#include "frame/services/strings.h"

#include <boost/shared_ptr.hpp>

#include <cstddef>
#include <map>

class KFS_StreamOverride;

// A set of overrides handed to an evaluation, at most one a stream, by the stream's capsule identifier. Copies share
// the overrides. There is no operation yet that adds one. Threads: one thread at a time.
class KFS_API KFS_ParamBag {
public:
    KFS_ParamBag() = default;
    KFS_ParamBag(KFS_ParamBag const&) = default;
    KFS_ParamBag(KFS_ParamBag&&) = default;
    // The union of both; where both hold an override for one stream, `a` wins.
    KFS_ParamBag(KFS_ParamBag const& a, KFS_ParamBag const& b);
    KFS_ParamBag& operator=(KFS_ParamBag const&) = default;
    KFS_ParamBag& operator=(KFS_ParamBag&&) = default;
    virtual ~KFS_ParamBag();

    std::size_t GetOverrideCount() const { return overrides_.size(); }

protected:
    using Overrides = std::map<u16str, boost::shared_ptr<KFS_StreamOverride>>;
    Overrides overrides_;
};
