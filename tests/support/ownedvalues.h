#pragma once

#include "keystore/attributes.h"
#include "keystore/edit.h"
#include "keystore/evaluate.h"
#include "keystore/stream.h"
#include "keystore/valuedata_private.h"

#include <gtest/gtest.h>

#include <cstring>
#include <map>
#include <memory>

// A custom value that owns something: a ticket for a number. Each ticket belongs to one place, so giving one back
// twice, or never, shows. Copying or disposing can be made to fail.
class OwnedValues {
public:
    struct Ticket {
        int number;
    };
    static inline int copyCode = 0;
    static inline int disposeCode = 0;

    static void Reset()
    {
        tickets_.clear();
        copyCode = 0;
        disposeCode = 0;
    }
    static int Live() { return static_cast<int>(tickets_.size()); }
    // Begins anew, and expects that nothing is left at its end. To be made before the streams.
    struct Scope {
        Scope() { Reset(); }
        ~Scope() { EXPECT_EQ(0, Live()); }
        Scope(Scope const&) = delete;
        Scope& operator=(Scope const&) = delete;
    };

    // A ticket that the test owns.
    static Ticket Make(double value)
    {
        tickets_[next_] = value;
        return {next_++};
    }
    static void Free(Ticket ticket)
    {
        EXPECT_EQ(1U, tickets_.erase(ticket.number)) << "ticket " << ticket.number << " isn't live";
    }
    static double Value(Ticket ticket)
    {
        auto const found = tickets_.find(ticket.number);
        EXPECT_NE(tickets_.end(), found) << "ticket " << ticket.number << " isn't live";
        return found != tickets_.end() ? found->second : -12345.0;
    }

    [[nodiscard]] static int Copy(KFS_Stream const*, long, short, void const* source, void* destination)
    {
        if (copyCode != 0) return copyCode;
        Ticket ticket{};
        std::memcpy(&ticket, source, sizeof ticket);
        Ticket const made = Make(Value(ticket));
        std::memcpy(destination, &made, sizeof made);
        return 0;
    }
    [[nodiscard]] static int Dispose(KFS_Stream const* stream, long, short, void* block)
    {
        EXPECT_EQ(KFS_StreamValidStamp, stream->GetStamp())
            << "a dying stream is whole until its values are given back";
        if (disposeCode != 0) return disposeCode;
        Ticket ticket{};
        std::memcpy(&ticket, block, sizeof ticket);
        Free(ticket);
        return 0;
    }
    // The earlier key's value.
    [[nodiscard]] static int Interpolate(KFS_Stream const* stream, long refcon, int, int keyIndex)
    {
        void const* item = nullptr;
        if (int const code = SEQ_GetConstAddress(stream->GetKeys(), keyIndex, &item)) return code;
        return Copy(stream, refcon, KFS_Item_CacheWhole, KFSp_ValueData(static_cast<KFS_KeyScalar const*>(item)),
                    KFSp_ValueData(stream->GetCache()));
    }

    static std::unique_ptr<KFS_Stream> MakeStream(bool noKeys, bool spatial = false)
    {
        KFS_ValueDesc desc;
        desc.isCustom = 1;
        desc.itemSize = sizeof(Ticket);
        desc.interpFunc = Interpolate;
        auto stream =
            std::make_unique<KFS_Stream>(1, 600, noKeys, spatial, KFS_InterpMask_All, 0, desc, nullptr, nullptr, false);
        EXPECT_EQ(0, KFS_SetCustomFuncs(stream.get(), Copy, Dispose));
        return stream;
    }
    static void InsertKey(KFS_Stream* stream, int time, double value, char interp = KFS_Interp_Hold)
    {
        T_Time const at{time, 600};
        Ticket const mine = Make(value);
        EXPECT_EQ(0, KFS_InsertKey(stream, &at, 0, &mine, interp, interp));
        Free(mine);
    }
    // The value that was at an index.
    static double RemoveKey(KFS_Stream* stream, int index)
    {
        Ticket out{};
        EXPECT_EQ(0, KFS_RemoveKey(stream, index, &out));
        return Take(stream, out);
    }
    // The value at a time, which is in the cache record afterwards.
    static double Read(KFS_Stream* stream, int time)
    {
        T_Time const at{time, 600};
        Ticket out{};
        EXPECT_EQ(0, KFS_GetValue(stream, &at, 0, &out, nullptr, nullptr));
        return Take(stream, out);
    }

private:
    static double Take(KFS_Stream* stream, Ticket ticket)
    {
        double const value = Value(ticket);
        EXPECT_EQ(0, KFS_DisposeValue(stream, &ticket));
        return value;
    }

    static inline std::map<int, double> tickets_;
    static inline int next_ = 1;
};
