#pragma once

#include "frame/boundary_private.h"
#include "host/session.h"
#include "keystore/edit.h"
#include "keystore/evaluate.h"
#include "keystore/stream.h"
#include "keystore/valuedata_private.h"
#include "tests/support/reports.h"

#include <gtest/gtest.h>

#include <array>
#include <cstddef>
#include <cstring>
#include <memory>
#include <vector>

// What a test stream is made of. The default: one double, keys at 600 units a second, every interpolation allowed.
struct StreamOptions {
    short dimension = 1;
    unsigned int timeScale = 600;
    bool noKeys = false;
    bool spatial = false;
    unsigned short interpMask = KFS_InterpMask_All;
    unsigned short spInterpMask = KFS_InterpMask_Negative;  // spatial streams get automatic tangents
    signed char type = KFS_Type_Double;
};

inline std::unique_ptr<KFS_Stream> MakeStream(StreamOptions const& options = {})
{
    KFS_ValueDesc desc;
    desc.dataType = options.type;
    return std::make_unique<KFS_Stream>(options.dimension, options.timeScale, options.noKeys, options.spatial,
                                        options.interpMask, options.spInterpMask, desc, nullptr, nullptr, false);
}

// A stream with short words for what tests do all the time. Times are values in the stream's scale.
class TestStream {
public:
    explicit TestStream(StreamOptions const& options = {}) : stream_(MakeStream(options)) {}

    KFS_Stream* get() const { return stream_.get(); }
    KFS_Stream* operator->() const { return stream_.get(); }
    operator KFS_Stream*() const { return stream_.get(); }

    T_Time Time(int value) const { return {value, stream_->GetTimeScale()}; }

    // Inserts or replaces a key; the codes go to both its sides.
    TestStream& Key(int time, std::vector<double> const& value, char inInterp, char outInterp)
    {
        T_Time const at = Time(time);
        EXPECT_EQ(0, KFS_InsertKeyF(stream_.get(), &at, 1, value.data(), inInterp, outInterp)) << "key at " << time;
        return *this;
    }
    TestStream& Key(int time, std::vector<double> const& value, char interp = KFS_Interp_Linear)
    {
        return Key(time, value, interp, interp);
    }

    // The value at a time.
    std::vector<double> At(int time) const
    {
        T_Time const at = Time(time);
        std::vector<double> value(static_cast<std::size_t>(stream_->GetDimension()), -12345.0);
        EXPECT_EQ(0, KFS_GetValueFPlus(stream_.get(), &at, 0, value.data(), nullptr, nullptr)) << "read at " << time;
        return value;
    }
    double At1(int time) const { return At(time)[0]; }

    int Count() const { return stream_->GetKeyData()->keys ? (*stream_->GetKeyData()->keys)->count : 0; }
    // The record of a key, for looking at what is stored. Valid until the list changes.
    KFS_KeyScalar* Record(int index) const
    {
        void const* item = nullptr;
        EXPECT_EQ(0, SEQ_GetConstAddress(stream_->GetKeys(), index, &item)) << "key " << index;
        return static_cast<KFS_KeyScalar*>(const_cast<void*>(item));
    }
    std::vector<int> Times() const
    {
        std::vector<int> times;
        for (int i = 0; i < Count(); ++i) times.push_back(Record(i)->time);
        return times;
    }
    // The numbers of a key's value data: five runs, or three on a spatial stream.
    std::vector<double> Numbers(int index) const
    {
        double const* const numbers = KFSp_Numbers(Record(index));
        return {numbers, numbers + stream_->GetDimension() * (stream_->IsSpatial() ? 3 : 5)};
    }
    int Pins() const { return stream_->GetKeys() ? SEQ_GetPinCount(stream_->GetKeys()) : 0; }
    bool CacheIsEmpty() const { return KFSp_CacheIsEmpty(stream_->GetCache()); }

    // The stale ranges: {first, last} of tangents and of arcs.
    std::array<int, 2> Stale() const { return {stream_->GetInvalidKeyIndex()[0], stream_->GetInvalidKeyIndex()[1]}; }
    std::array<int, 2> ArcStale() const
    {
        return {stream_->GetArcInvalidKeyIndex()[0], stream_->GetArcInvalidKeyIndex()[1]};
    }
    static constexpr std::array<int, 2> NotStale{KFS_INVALID_INDEX, KFS_INVALID_INDEX};

    // A copy of everything stored: every byte of every record, to see that nothing changed. Arc tables count by
    // address.
    std::vector<unsigned char> Bytes() const
    {
        std::vector<unsigned char> bytes;
        for (int i = 0; i < Count(); ++i) {
            auto const* const record = reinterpret_cast<unsigned char const*>(Record(i));
            bytes.insert(bytes.end(), record,
                         record + KFSp_ValueDataOffset(Record(i)) + static_cast<int>(8 * Numbers(i).size()));
        }
        return bytes;
    }

private:
    std::unique_ptr<KFS_Stream> stream_;
};

// A running library with a current render context, and a recorder that fails the test on reports that it doesn't take.
class StreamTest : public testing::Test {
protected:
    kfshost::Session session;
    ReportRecorder reports;
};

// A stream after its destruction: its stamp is wrong, and nothing of it may be touched.
class DamagedStream {
public:
    DamagedStream()
    {
        KFS_ValueDesc desc;
        desc.dataType = KFS_Type_Double;
        stream_ = new (storage_) KFS_Stream(2, 600, 0, 1, KFS_InterpMask_All, 0, desc, nullptr, nullptr, false);
        stream_->~KFS_Stream();
        std::memcpy(before_, storage_, sizeof storage_);
    }
    KFS_Stream* get() const { return stream_; }
    bool Untouched() const { return std::memcmp(before_, storage_, sizeof storage_) == 0; }

private:
    alignas(KFS_Stream) std::byte storage_[sizeof(KFS_Stream)];
    std::byte before_[sizeof(KFS_Stream)];
    KFS_Stream* stream_;
};

// What a damaged stream's refusal reports, with the action that was asked of it.
inline Reported DamagedReport(int operation, std::string const& action)
{
    return KfsReport(operation, "attempt to " + action + " an internally damaged time stream.");
}

// What a stream without a value reports, with the action that was asked of it.
inline std::string NoKeysText(std::string const& action)
{
    return "attempt to " + action + " a time stream with no key values.";
}

// Runs `edit` with the n-th allocation failing, for n = 1, 2, ... until it gets through untouched. `make` builds the
// fixture anew each time, `edit` takes it and answers the code, as a caller would have it: what throws is a failure,
// unless it may (AtBoundary). `check` looks at the fixture after each failure. Answers how many failures there were.
template <class Make, class Edit, class Check>
int FailEveryAllocation(Make&& make, Edit&& edit, Check&& check)
{
    for (int n = 1; n < 200; ++n) {
        auto fixture = make();
        SCOPED_TRACE(testing::Message() << "allocation " << n);
        Q_MemoryCount const before = Q_MemoryLive(nullptr);
        int code = -1;
        Q_FailAllocation(n);
        EXPECT_NO_THROW(code = edit(*fixture));
        bool const fired = Q_FailAllocationFired();
        Q_FailAllocation(0);
        EXPECT_TRUE(code == 0 || (fired && code == 4)) << code;
        if (!fired) return n - 1;
        check(*fixture, code, before);
    }
    ADD_FAILURE() << "it never gets through";
    return 0;
}

// An operation of a class, which throws its code.
template <class Edit>
auto AtBoundary(Edit edit)
{
    return [edit](auto& fixture) { return KFSp_Boundary([&] { return edit(fixture); }); };
}
