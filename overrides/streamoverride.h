#pragma once

#include "frame/export.h"
#include "frame/services/identifiers.h"
#include "frame/services/time.h"
#include "overrides/overridevalue.h"

#include <boost/function.hpp>

class KFS_Stream;
class KFS_StreamBase;

// Bits of an override's flag word.
enum KFS_OverrideFlag : unsigned short {
    KFS_OverrideFlag_ForEffectStream = 0x1,
    KFS_OverrideFlag_IgnoreExpressions = 0x2,
};

// Replaces the value of one stream during an evaluation: by a fixed value, or by one that a function computes for a
// time. A computed one may name the stream from which the value comes, so that a render's identity follows that stream.
//
// Lives in a KFS_ParamBag, by shared pointer, and isn't changed once it is there. The streams aren't owned and must
// outlive it; their addresses take part in order and hash, which are therefore meaningful inside one process only.
// Threads: any number of readers. A value function must be safe for that.
class KFS_API KFS_StreamOverride {
public:
    // Computes the value at a time from the override's own, with which `value` comes in.
    using ValueFunc = boost::function<void(T_Time const& time, KFS_OverrideValue& value)>;

    KFS_StreamOverride(KFS_StreamBase const* stream, KFS_OverrideValue value, bool forEffectStream);
    //   getter    the stream that the value comes from, or null
    //   offset    what to add to a time to have the time on `getter`
    //   identity  stands for `func` in hashes and comparisons, beside getter and offset
    KFS_StreamOverride(KFS_StreamBase const* stream, KFS_OverrideValue value, KFS_Stream const* getter, T_Time offset,
                       ValueFunc const& func, hearth::utility::Guid identity, bool forEffectStream);
    KFS_StreamOverride(KFS_StreamOverride const& source);
    KFS_StreamOverride& operator=(KFS_StreamOverride const&) = delete;
    virtual ~KFS_StreamOverride();

    KFS_StreamBase const* GetStreamBase() const { return stream_; }
    // Lets through what the value function throws.
    KFS_OverrideValue GetValAtTime(T_Time const& time) const;
    // The value that the function starts from, or the fixed one.
    KFS_OverrideValue const& GetValue() const { return value_; }
    // Whether there is no function.
    bool IsTimeInvariant() const { return valueFunc_.empty(); }
    // False without a getter; nothing is written then. Else the start of `span`, which may be null, is moved by the
    // offset. Throws the time service's code.
    bool GetValueGetterStream(KFS_Stream const** stream, T_TimeSpan* span) const;
    bool GetIsForEffectStream() const { return (flags_ & KFS_OverrideFlag_ForEffectStream) != 0; }
    // To be set before the override is shared.
    void SetIgnoreExpressions(bool ignore);
    bool GetIgnoreExpressions() const { return (flags_ & KFS_OverrideFlag_IgnoreExpressions) != 0; }

    // Flags, the stream's address and the value; with a getter also its address, the offset and the identity.
    void MixIn(KFS_OverrideHash& hash) const;

    // The left operand decides what is compared: with a getter the source of the value (stream, getter, offset,
    // identity) and not the value; without one stream and value, whatever the right one's getter. Flags always count.
    bool operator==(KFS_StreamOverride const& other) const;
    bool operator!=(KFS_StreamOverride const& other) const { return !(*this == other); }
    // A strict order among overrides with getters and among those without; the left one decides between the two.
    bool operator<(KFS_StreamOverride const& other) const;

private:
    KFS_StreamBase const* stream_;
    KFS_OverrideValue value_;
    KFS_Stream const* valueGetterStream_ = nullptr;
    T_Time valueGetterOffset_{0, 1};
    ValueFunc valueFunc_;
    hearth::utility::Guid identity_;
    unsigned short flags_;
};
