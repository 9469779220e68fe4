#include "persist/keyrecords_private.h"

#include "keystore/items_private.h"
#include "tests/persist/leaffile.h"
#include "tests/support/ownedvalues.h"

#include <random>

namespace {

class KeyRecords : public StreamTest {};

Reported Corrupt(int severity, std::string const& text)
{
    return {0x1D0077, severity, "The project file is corrupt. Stored keyframes " + text, 0};
}
std::string const MissingData = "are missing data.";
std::string const Mismatch =
    "do not match the property type. Attempting to read the keyframes by truncating the values.";

// The bytes of all items of a disk list.
std::vector<std::string> Items(SEQ_Head** list)
{
    std::vector<std::string> items;
    for (int i = 0; i < (*list)->count; ++i) {
        void const* item = nullptr;
        EXPECT_EQ(0, SEQ_GetConstAddress(list, i, &item));
        items.emplace_back(static_cast<char const*>(item), static_cast<std::size_t>((*list)->itemSize));
    }
    return items;
}

std::vector<std::string> ToDisk(KFS_Stream* stream)
{
    KFSp_ScList disk;
    EXPECT_EQ(0, KFSp_CreateKeyDiskList(stream, disk.list));
    EXPECT_EQ(stream, (*disk.list)->refcon);
    EXPECT_EQ(0, KFSp_Boundary([&] { KFSp_ConvertToKeyDiskList(stream, disk.list); }));
    EXPECT_EQ(0, SEQ_GetPinCount(disk.list));
    return Items(disk.list);
}

// The code of the conversion of a list with such items.
int FromDisk(KFS_Stream* stream, int itemSize, std::vector<std::string> const& items)
{
    KFSp_ScList disk;
    EXPECT_EQ(0, SEQ_New(0, static_cast<short>(itemSize), 4, 1, &disk.list));
    for (std::string item : items) {
        item.resize(static_cast<std::size_t>(itemSize));
        EXPECT_EQ(0, SEQ_InsertCopy(item.data(), -1, disk.list, 0));
    }
    int const code = KFSp_Boundary([&] { KFSp_ConvertFromKeyDiskList(stream, disk.list); });
    EXPECT_EQ(0, SEQ_GetPinCount(disk.list));
    return code;
}

TEST_F(KeyRecords, SpatialRecordsHaveNoArcTable)
{
    TestStream stream({.dimension = 2, .spatial = true});
    stream.Key(0, {0, 0}).Key(60, {30, 40}).Key(120, {60, 0});
    stream.At(30);  // measures the first arc
    ASSERT_NE(nullptr, stream.Record(0)->remapTable);
    KFS_KeyScalar* const key = stream.Record(0);
    key->spFlags = 0x01020304;
    key->arcLength = 5.5;
    key->inSpeed = 1.25;
    key->inInfluence = 0.125;
    key->outSpeed = 2.25;
    key->outInfluence = 0.375;
    std::vector<std::string> const items = ToDisk(stream);
    EXPECT_EQ(KeyHead(0, key->inInterp, key->outInterp, key->flags) + Long(0x01020304) + Long(0) +
                  Doubles({5.5, 1.25, 0.125, 2.25, 0.375}) + Doubles(stream.Numbers(0)),
              items[0]);
    EXPECT_EQ(items, ToDisk(stream)) << "twice the same";
    EXPECT_NE(nullptr, stream.Record(0)->remapTable) << "the stream keeps what it has";
}

TEST_F(KeyRecords, ClientsBytesAreNotSwapped)
{
    for (bool const spatial : {false, true}) {
        SCOPED_TRACE(spatial);
        OwnedValues::Reset();
        {
            auto const stream = OwnedValues::MakeStream(false, spatial);
            OwnedValues::Ticket const ticket = OwnedValues::Make(7.0);
            T_Time const at{5, 600};
            ASSERT_EQ(0, KFS_InsertKey(stream.get(), &at, 1, &ticket, KFS_Interp_Linear, KFS_Interp_Linear));
            std::vector<std::string> const items = ToDisk(stream.get());
            ASSERT_EQ(1u, items.size());
            EXPECT_EQ(spatial ? 60u : 12u, items[0].size());
            void const* item = nullptr;
            ASSERT_EQ(0, SEQ_GetConstAddress(stream->GetKeys(), 0, &item));
            EXPECT_EQ(0, std::memcmp(items[0].data() + items[0].size() - 4,
                                     KFSp_ValueData(static_cast<KFS_KeyScalar const*>(item)), 4));
            OwnedValues::Free(ticket);
        }
        EXPECT_EQ(0, OwnedValues::Live());
    }
}

// What any stream holds comes back bit for bit: times, codes, flags and every number, NaNs and infinities too.
TEST_F(KeyRecords, ThereAndBack)
{
    std::mt19937_64 random(20240917);
    for (int round = 0; round < 60; ++round) {
        SCOPED_TRACE(round);
        StreamOptions options;
        options.spatial = round % 2 == 1;
        options.dimension = static_cast<short>(options.spatial ? 2 + round % 3 : 1 + round % 5);
        TestStream stream(options);
        int const count = static_cast<int>(random() % 9);
        ASSERT_EQ(0, KFSp_CreateKeyList(stream));
        for (int i = 0; i < count; ++i)
            stream.Key(i * 10 - 30, std::vector<double>(static_cast<std::size_t>(options.dimension), 1.0));
        for (int i = 0; i < count; ++i) {
            KFS_KeyScalar* const key = stream.Record(i);
            unsigned short const layout = key->flags & KFS_KeyFlag_SpatialBlock;
            key->inInterp = static_cast<signed char>(random());
            key->flags = static_cast<unsigned short>((random() & 0xFFFE) | layout);
            for (std::size_t n = 0; n < stream.Numbers(i).size(); ++n) {
                std::uint64_t const bits = random();
                std::memcpy(KFSp_Numbers(key) + n, &bits, sizeof bits);
            }
        }
        std::vector<std::string> const items = ToDisk(stream);
        int const itemSize = options.dimension * (options.spatial ? 24 : 40) + (options.spatial ? 56 : 8);
        TestStream other(options);
        other.Key(3, std::vector<double>(static_cast<std::size_t>(options.dimension), 9.0));  // doesn't stay
        ASSERT_EQ(0, FromDisk(other, itemSize, items));
        ASSERT_NE(nullptr, other->GetKeys()) << "an empty list is a list";
        EXPECT_EQ(stream.Times(), other.Times());
        EXPECT_EQ(items, ToDisk(other));
        EXPECT_EQ(0, other.Pins());
        for (int i = 0; options.spatial && i < count; ++i) EXPECT_EQ(nullptr, other.Record(i)->remapTable);
    }
}

TEST_F(KeyRecords, RecordsThatLackDataAreRefused)
{
    for (bool const spatial : {false, true}) {
        SCOPED_TRACE(spatial);
        TestStream stream({.dimension = 2, .spatial = spatial});
        stream.Key(1, {2, 3}).Key(4, {5, 6});
        std::vector<unsigned char> const before = stream.Bytes();
        SEQ_Head** const list = stream->GetKeys();
        int const needed = spatial ? 56 + 48 : 8 + 80;
        EXPECT_EQ(21, FromDisk(stream, needed - 1, {""}));
        EXPECT_EQ((std::vector<Reported>{Corrupt(4, MissingData)}), reports.Take());
        EXPECT_EQ(list, stream->GetKeys());
        EXPECT_EQ(before, stream.Bytes());
    }
}

// The numbers of a record are cut at a byte, not at a run: those of the old dimension pass for those of the new one.
TEST_F(KeyRecords, RecordsThatHoldMoreAreCut)
{
    TestStream stream;
    std::string const record = KeyHead(7, 1, 1, 0) + Doubles({1, 2, 3, 4, 5, 6, 7, 8, 9, 10});
    ASSERT_EQ(0, FromDisk(stream, 88, {record}));
    EXPECT_EQ((std::vector<Reported>{Corrupt(8, Mismatch)}), reports.Take());
    ASSERT_EQ((std::vector<int>{7}), stream.Times());
    // Only the stream's own 40 bytes are numbers in the file's order.
    EXPECT_EQ((std::vector<double>{1, 2, 3, 4, 5}), stream.Numbers(0));
}

TEST_F(KeyRecords, ASpatialRecordNeverReachesBeyondItsItem)
{
    TestStream stream({.dimension = 2, .spatial = true});
    std::string record = KeyHead(7, 1, 1, KFS_KeyFlag_SpatialBlock) + Long(0) + Long(0xFFFFFFFF) +
                         Doubles({1, 2, 3, 4, 5}) + Doubles({10, 11, 12, 13, 14, 15});
    ASSERT_EQ(0, FromDisk(stream, 104, {record}));
    EXPECT_EQ((std::vector<double>{10, 11, 12, 13, 14, 15}), stream.Numbers(0));
    record += std::string(400, '\xEE');
    ASSERT_EQ(0, FromDisk(stream, static_cast<int>(record.size()), {record, record}));
    EXPECT_EQ((std::vector<Reported>{Corrupt(8, Mismatch)}), reports.Take());
    for (int i = 0; i < 2; ++i) {
        EXPECT_EQ((std::vector<double>{10, 11, 12, 13, 14, 15}), stream.Numbers(i));
        EXPECT_EQ(nullptr, stream.Record(i)->remapTable);
    }
}

// A file's flag could make numbers pass for an arc table, which somebody would then dispose.
TEST_F(KeyRecords, TheLayoutOfAKeyIsTheStreams)
{
    TestStream plain;
    ASSERT_EQ(0, FromDisk(plain, 48, {KeyHead(0, 1, 1, 0xFFFF) + Doubles({1, 2, 3, 4, 5})}));
    EXPECT_EQ(0xFFFE, plain.Record(0)->flags);
    TestStream spatial({.dimension = 1, .spatial = true});
    ASSERT_EQ(0, FromDisk(spatial, 80, {KeyHead(0, 1, 1, 0) + std::string(72, '\0')}));
    EXPECT_EQ(KFS_KeyFlag_SpatialBlock, spatial.Record(0)->flags);
}

// A stream whose values are pointers, which mean nothing in a file.
class PointerStream : public KFS_Stream {
public:
    explicit PointerStream(bool spatial)
        : KFS_Stream(1, 600, 0, spatial, KFS_InterpMask_All, 0, {.isCustom = 1, .itemSize = 8}, nullptr, nullptr, false)
    {}
    bool IsCustomValuePointer() const override { return true; }
};

TEST_F(KeyRecords, AStreamOfPointersTakesRecordsOfAnySize)
{
    for (bool const spatial : {false, true}) {
        for (int const size : {1, 8, 10, 57, 100}) {
            SCOPED_TRACE(testing::Message() << spatial << ' ' << size);
            PointerStream stream(spatial);
            std::string const item(static_cast<std::size_t>(size), '\x01');
            ASSERT_EQ(0, FromDisk(&stream, size, {item, item}));
            void const* key = nullptr;
            ASSERT_EQ(0, SEQ_GetConstAddress(stream.GetKeys(), 1, &key));
            EXPECT_EQ(size < 4 ? 0x01000000 : 0x01010101, static_cast<KFS_KeyScalar const*>(key)->time);
            EXPECT_EQ(size > (spatial ? 76 : 16) ? 1u : 0u, reports.Take().size());
        }
    }
}

}  // namespace
