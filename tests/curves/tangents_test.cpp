#include "curves/tangents.h"

#include "curves/spacetangents.h"
#include "curves/update.h"
#include "frame/services/memory.h"
#include "keystore/keyflags.h"
#include "tests/curves/threekeys.h"
#include "tests/support/listening.h"

#include <algorithm>
#include <cmath>
#include <functional>
#include <limits>
#include <stdexcept>
#include <string_view>

namespace {

using TangentsTest = StreamTest;

// ---- influences

// Setters and flags bring nothing up to date: what was just given is what stays.
TEST_F(TangentsTest, WhatWasGivenStandsWhenAKeyStopsBeingAutomatic)
{
    static double const number = 0.4;
    int (*const stops[])(KFS_Stream*) = {
        [](KFS_Stream* s) { return KFS_SetKeyModifiable(s, 0, 1); },
        [](KFS_Stream* s) { return KFS_SetKeyInfluence(s, 1, &number, nullptr); },
        [](KFS_Stream* s) { return KFS_SetKeyVelocityF(s, 1, &number, nullptr); },
    };
    for (bool const spatial : {false, true}) {
        for (auto const stop : stops) {
            KeyedStream stream = MakeThree(spatial);
            stream.Flag(1, KFS_KeyFlag_Modifiable);
            double const x = 0.5;
            double const y = 3.0;
            ASSERT_EQ(0, KFS_SetKeyTangentsF(stream, 1, nullptr, nullptr, &x, &y, 1.0));
            ASSERT_EQ(0, stop(stream));
            ASSERT_EQ(0, stream->UpdateStream());
            EXPECT_EQ(6.0, stream.GetHandle(1).outSpeed);
            EXPECT_EQ(0.25, stream.GetHandle(1).outInfluence);
        }
    }
}

// ---- all doors

struct Door {
    char const* name;
    std::function<int(KFS_Stream*, int index)> call;
    int damagedOperation;
    char const* damagedAction;
    int noKeysOperation;
    char const* noKeysAction;
};

std::vector<Door> Doors()
{
    static double const in = -0.5;
    static double const out = 0.5;
    static double number[8];
    static int count;
    static T_Time times[2];
    return {
        {"KFS_SetKeyTangentsF",
         [](KFS_Stream* s, int i) { return KFS_SetKeyTangentsF(s, i, &in, &in, &out, &out, 1.0); }, 29,
         "get a value from", 30, "get a value from"},
        {"KFS_GetKeyTangentsF",
         [](KFS_Stream* s, int i) { return KFS_GetKeyTangentsF(s, i, number, number + 1, number + 2, number + 3); }, 30,
         "get a value from", 30, "get a value from"},
        {"KFS_SetKeyVelocity", [](KFS_Stream* s, int i) { return KFS_SetKeyVelocity(s, i, &in, &out); }, 51,
         "alter a key value in", 51, "inquire about a key value in"},
        {"KFS_SetKeyVelocityF", [](KFS_Stream* s, int i) { return KFS_SetKeyVelocityF(s, i, &in, &out); }, 55,
         "alter a key value in", 51, "inquire about a key value in"},
        {"KFS_GetKeyVelocityF", [](KFS_Stream* s, int i) { return KFS_GetKeyVelocityF(s, i, 0, number, number + 1); },
         52, "get a value from", 52, "get a value from"},
        {"KFS_SetKeyInfluence", [](KFS_Stream* s, int i) { return KFS_SetKeyInfluence(s, i, &out, &out); }, 53,
         "alter a key value in", 53, "inquire about a key value in"},
        {"KFS_GetKeyInfluence", [](KFS_Stream* s, int i) { return KFS_GetKeyInfluence(s, i, number, number + 1); }, 54,
         "get a value from", 54, "get a value from"},
        {"KFS_GetClampedVelInflF",
         [](KFS_Stream* s, int i) {
             return KFS_GetClampedVelInflF(s, i, 0, number, number + 1, number + 2, number + 3, nullptr);
         },
         101, "get a value from", 101, "get a value from"},
        {"KFS_GetZeroVelocityPoints",
         [](KFS_Stream* s, int i) { return KFS_GetZeroVelocityPoints(s, i, 0, &count, times, nullptr); }, 103,
         "alter a key value in", 103, "alter a key value in"},
    };
}

// A render's copy of the keys is made by whatever reads first.
TEST_F(TangentsTest, NoDoorLetsThroughWhatACopyThrows)
{
    for (Door const& door : Doors()) {
        SCOPED_TRACE(door.name);
        KeyedStream const stream = MakeThree();
        Q_ScSetCurrentRenderContext const current(kfshost::MakeRenderContext(true));
        Q_FailAllocation(1);
        int code = 0;
        EXPECT_NO_THROW(code = door.call(stream, 1));
        EXPECT_TRUE(Q_FailAllocationFired());
        Q_FailAllocation(0);
        EXPECT_EQ(4, code);
        reports.Take();  // std::bad_alloc is reported where it is translated
        EXPECT_EQ(0, door.call(stream, 1));
    }
}

// A client's type of eight bytes a value and one of four: neither has room for handles.

int InterpolateCustom(KFS_Stream const*, long, int, int)
{
    return 0;
}

KFS_ValueDesc CustomValue(unsigned short size)
{
    KFS_ValueDesc desc;
    desc.isCustom = 1;
    desc.itemSize = size;
    desc.dataType = 5;
    desc.interpFunc = &InterpolateCustom;
    return desc;
}

TEST_F(TangentsTest, CustomKeysHoldNoHandles)
{
    for (unsigned short const size : {4, 8, 16}) {
        SCOPED_TRACE(size);
        KFS_Stream stream(1, 600, 0, 0, KFS_InterpMask_All, 0, CustomValue(size), nullptr, nullptr, false);
        std::array<unsigned char, 16> value{};
        for (int k = 0; k < 3; ++k) {
            value.fill(static_cast<unsigned char>(k + 1));
            T_Time const time{600 * k, 600};
            ASSERT_EQ(0, KFS_InsertKey(&stream, &time, 1, value.data(), k == 0 ? L : S, k == 0 ? L : S));
        }
        auto const bytes = [&] {
            std::vector<unsigned char> all;
            for (int k = 0; k < 3; ++k) {
                void const* item = nullptr;
                EXPECT_EQ(0, SEQ_GetConstAddress(stream.GetKeys(), k, &item));
                all.insert(all.end(), static_cast<unsigned char const*>(item) + 8,
                           static_cast<unsigned char const*>(item) + 8 + size);
            }
            return all;
        };
        std::vector<unsigned char> const before = bytes();
        double const number = 0.5;
        double const x = -0.5;
        EXPECT_EQ(0, KFS_SetKeyTangentsF(&stream, 1, &x, &x, &number, &number, 1.0));
        EXPECT_EQ(0, KFS_SetKeyVelocityF(&stream, 1, &number, &number));
        EXPECT_EQ(0, KFS_SetKeyVelocity(&stream, 1, value.data(), value.data()));
        EXPECT_EQ(0, KFS_SetKeyInfluence(&stream, 1, &number, &number));
        EXPECT_EQ(before, bytes());
        EXPECT_TRUE(stream.IsCustom());

        double a = 9.0, b = 9.0, c = 9.0, d = 9.0, e = 9.0, f = 9.0;
        EXPECT_EQ(0, KFS_GetKeyTangentsF(&stream, 1, &a, &b, &c, &d));
        EXPECT_EQ(0, KFS_GetKeyVelocityF(&stream, 1, 0, &e, &f));
        for (double const answer : {a, b, c, d, e, f}) EXPECT_EQ(0.0, answer);
        unsigned char clamped = 0;
        a = b = 100.0;
        EXPECT_EQ(0, KFS_GetClampedVelInflF(&stream, 1, 0, &a, &b, &a, &b, &clamped));
        EXPECT_EQ(0, clamped);

        a = b = 9.0;
        if (size == 8) {
            EXPECT_EQ(0, KFS_GetKeyInfluence(&stream, 1, &a, &b));
            EXPECT_EQ(0.16666666667, a);
            EXPECT_EQ(0.16666666667, b);
        } else {
            EXPECT_EQ(KFS_Err_CustomNotAllowed, KFS_GetKeyInfluence(&stream, 1, &a, &b));
            EXPECT_REPORT(reports, 54, "Attempting to get the key influence of a custon non-spatial stream.");
            EXPECT_EQ(9.0, a);
        }
    }
}

// The doubles' description isn't what a cached custom value is disposed by.
TEST_F(TangentsTest, ACachedCustomValueIsDisposedAsWhatItIs)
{
    KFS_Stream stream(1, 600, 0, 0, KFS_InterpMask_All, 0, CustomValue(8), nullptr, nullptr, false);
    long const value = 1;
    T_Time const time{0, 600};
    ASSERT_EQ(0, KFS_InsertKey(&stream, &time, 1, &value, L, L));
    ASSERT_EQ(0, stream.GetKeyData()->keys ? SEQ_GetItemCopy(stream.GetKeys(), 0, 0, stream.GetCache()) : 1);
    static std::vector<long> disposedWith;
    disposedWith.clear();
    stream.SetDisposeItemFunc([](KFS_Stream const*, long refcon, short, void*) {
        disposedWith.push_back(refcon);
        return 0;
    });
    double const speed = 1.0;
    ASSERT_EQ(0, KFS_SetKeyVelocityF(&stream, 0, &speed, &speed));
    stream.SetDisposeItemFunc(nullptr);
    EXPECT_EQ(std::vector<long>{5}, disposedWith);
    EXPECT_TRUE(KFSp_CacheIsEmpty(stream.GetCache()));
}

// ---- notifications

// A listener that reads in the stream's own type would get doubles otherwise, for which it has no room.
TEST_F(TangentsTest, ListenersHearOfDoublesWhenTheStreamIsItselfAgain)
{
    HeardRoot root;
    KeyedStream stream =
        MakeKeyed({{0, 1.0}, {600, 2.0}}, S, {.dimension = 2, .spatial = true, .type = KFS_Type_Float});
    root.Store(stream);
    ValueListener listener([&] {
        EXPECT_EQ(KFS_Type_Float, stream->GetValueDesc()->dataType);
        EXPECT_EQ(nullptr, stream->GetCopyItemFunc());
        float read[3] = {0.0F, 0.0F, -1.0F};
        T_Time const time{300, 600};
        EXPECT_EQ(0, KFS_GetValuePlus(stream, &time, 0, read, nullptr, nullptr, nullptr, 0));
        EXPECT_EQ(-1.0F, read[2]);
    });
    double const value[2] = {1.0, 2.0};
    EXPECT_EQ(0, KFS_SetKeyVelocityF(stream, 1, value, nullptr));
    EXPECT_EQ(0, KFS_SetKeySpaceTangentsF(stream, 1, 0, value, nullptr));
    EXPECT_EQ(2, listener.Take());
    stream->SetParent(nullptr);
}

}  // namespace
