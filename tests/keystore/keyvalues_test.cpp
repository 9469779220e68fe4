#include "keystore/lookup.h"

#include "tests/support/streams.h"

#include <cstring>

namespace {

class KeyValues : public StreamTest {};

TEST_F(KeyValues, KeysAreReadInTheStreamsExternalForm)
{
    TestStream stream({.dimension = 3, .type = KFS_Type_S16});
    stream.Key(0, {0.0, 0.0, 0.0}, KFS_Interp_Hold)
        .Key(10, {-1.5, 2.25, 40000.0}, KFS_Interp_Linear, KFS_Interp_Spline);
    std::array<short, 4> value{77, 77, 77, 77};
    char in = 77;
    char out = 77;
    EXPECT_EQ(0, KFS_GetKey(stream, 1, value.data(), &in, &out));
    EXPECT_EQ((std::array<short, 4>{-2, 2, 40000 - 65536, 77}), value) << "halves away from zero, nothing is clamped";
    EXPECT_EQ(KFS_Interp_Linear, in);
    EXPECT_EQ(KFS_Interp_Spline, out);
    std::array<double, 4> numbers{77.0, 77.0, 77.0, 77.0};
    EXPECT_EQ(0, KFS_GetKeyF(stream, -1, numbers.data(), &in, &out)) << "-1 names the last key";
    EXPECT_EQ((std::array{-1.5, 2.25, 40000.0, 77.0}), numbers);
    unsigned short flags = 0;
    stream.Record(1)->flags |= KFS_KeyFlag_Continuous;
    EXPECT_EQ(0, KFS_GetKeyFlags(stream, 1, &flags));
    EXPECT_EQ(stream.Record(1)->flags, flags);
    for (int const bad : {2, -2}) {
        EXPECT_EQ(SEQ_Err_BadIndex, KFS_GetKeyFlags(stream, bad, &flags));
        EXPECT_EQ(SEQ_Err_BadIndex, KFS_GetKey(stream, bad, value.data(), &in, &out));
        EXPECT_EQ(SEQ_Err_BadIndex, KFS_GetKeyF(stream, bad, numbers.data(), &in, &out));
        EXPECT_EQ(KFS_Interp_None, in);
    }
}

// A key whose flag says so has its value behind the short head, on a spatial stream too.
TEST_F(KeyValues, TheRecordSaysWhereItsValueIs)
{
    TestStream stream({.dimension = 2, .spatial = true});
    stream.Key(0, {3.0, 4.0});
    KFS_KeyScalar* const key = stream.Record(0);
    key->flags = static_cast<unsigned short>(key->flags & ~KFS_KeyFlag_SpatialBlock);
    KFSp_Numbers(key)[0] = 8.0;
    KFSp_Numbers(key)[1] = 9.0;
    std::array<double, 2> numbers{};
    EXPECT_EQ(0, KFS_GetKeyF(stream, 0, numbers.data(), nullptr, nullptr));
    EXPECT_EQ((std::array{8.0, 9.0}), numbers);
    key->flags |= KFS_KeyFlag_SpatialBlock;
    key->remapTable = nullptr;
}

struct CopyCall {
    KFS_Stream const* stream;
    long refcon;
    short kind;
};
CopyCall lastCopy;

int RememberingCopy(KFS_Stream const* stream, long refcon, short kind, void const* source, void* destination)
{
    lastCopy = {stream, refcon, kind};
    std::memcpy(destination, source, stream->GetValueDesc()->itemSize);
    return refcon < 0 ? 4711 : 0;
}

TEST_F(KeyValues, ACustomValueGoesThroughTheClientsFunctionAndNeverAsDoubles)
{
    for (bool const noKeys : {false, true}) {
        for (long const word : {42L, -42L}) {
            KFS_ValueDesc desc{1, 8, word, [](KFS_Stream const*, long, int, int) { return 0; }};
            KFS_Stream stream(1, 600, noKeys, 0, KFS_InterpMask_Hold, 0, desc, nullptr, nullptr, false);
            long const stored = 0x1122334455667788;
            ASSERT_EQ(0, KFS_InsertKey(&stream, nullptr, 1, &stored, KFS_Interp_Hold, KFS_Interp_Hold));
            stream.SetCopyItemFunc(RememberingCopy);
            long value = 0;
            char in = 77;
            EXPECT_EQ(word < 0 ? 4711 : 0, KFS_GetKey(&stream, 0, &value, &in, nullptr));
            EXPECT_EQ(stored, value);
            EXPECT_EQ(KFS_Interp_Hold, in) << "also where the copy fails";
            EXPECT_EQ(&stream, lastCopy.stream);
            EXPECT_EQ(word, lastCopy.refcon);
            EXPECT_EQ(noKeys ? KFS_Item_CacheValue : KFS_Item_KeyValue, lastCopy.kind);
            stream.SetCopyItemFunc(nullptr);
            value = 0;
            EXPECT_EQ(0, KFS_GetKey(&stream, 0, &value, nullptr, nullptr)) << "the bytes, without a function";
            EXPECT_EQ(stored, value);
            double number = 77.0;
            EXPECT_EQ(7441, KFS_GetKeyF(&stream, 99, &number, nullptr, nullptr)) << "before the index is looked at";
            EXPECT_EQ(77.0, number);
            EXPECT_REPORT(reports, 115, "can#{rsquo}t compute floating point value(s) for a custom value");
            EXPECT_EQ(0, KFS_GetKeyF(&stream, 0, nullptr, &in, nullptr)) << "the codes are no value";
        }
    }
}

}  // namespace
