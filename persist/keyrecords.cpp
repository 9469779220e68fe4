#include "persist/keyrecords_private.h"

#include "frame/boundary_private.h"
#include "frame/report_private.h"
#include "frame/services/byteorder.h"
#include "frame/services/reports.h"
#include "keystore/edit_private.h"
#include "keystore/items_private.h"
#include "keystore/keylist_private.h"
#include "keystore/pins_private.h"
#include "persist/leafchunks_private.h"

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <vector>

namespace {

constexpr int ReadKeysReportId = 0x1D0077;
constexpr int MissingDataCode = 21;

constexpr char const* TooSmallText = "$$$/VX/KFS/ReadKeyframes/BadOnDiskItemSize="
                                     "The project file is corrupt. Stored keyframes are missing data.";
constexpr char const* TooBigText =
    "$$$/VX/KFS/ReadKeyframes/KeyframeSizeMismatchError=The project file is corrupt. Stored keyframes do not match the "
    "property type. Attempting to read the keyframes by truncating the values.";

// What a stream's records look like.
struct Layout {
    explicit Layout(KFS_Stream const* stream)
        : spatial(stream->IsSpatial()),
          custom(stream->IsCustom()),
          pointers(custom && stream->IsCustomValuePointer()),
          diskHead(spatial ? KFSp_DiskSpatialHeadSize : KFSp_DiskHeadSize),
          memoryHead(spatial ? KFS_KeySpatialHeadSize : KFS_KeyHeadSize),
          data(KFSp_ValueDataSize(stream))
    {}
    int DiskSize() const { return diskHead + data; }

    bool spatial;
    bool custom;
    bool pointers;
    int diskHead;
    int memoryHead;
    int data;
};

// Whether the two records hold the same in the same places, so that they differ in the order of bytes alone. They are
// turned over in one pass then, item by item where lists may be asked for items only.
bool DiffersInByteOrderOnly(Layout const& layout)
{
    return KFSp_HasShortcuts && !layout.spatial && !layout.custom && layout.data % 8 == 0;
}

void TurnRecord(unsigned char* to, unsigned char const* from, int numbers, int sixthBits)
{
    std::uint32_t time;
    std::memcpy(&time, from, sizeof time);
    time = __builtin_bswap32(time);
    std::memcpy(to, &time, sizeof time);
    to[4] = from[4];
    to[5] = from[5];
    to[6] = static_cast<unsigned char>(from[7] & sixthBits);
    to[7] = from[6];
    for (int i = 1; i <= numbers; ++i) {
        std::uint64_t number;
        std::memcpy(&number, from + 8 * i, sizeof number);
        number = __builtin_bswap64(number);
        std::memcpy(to + 8 * i, &number, sizeof number);
    }
}

// Turns the records of one list over into the other, which is empty. False, and nothing done but that there is room,
// where that list wants its items through its operations. `sixthBits`: what is wanted of the flags' low byte, which has that place in memory.
bool TurnRecords(Layout const& layout, SEQ_Head const* const* from, SEQ_Head** to, int sixthBits)
{
    int const count = (*from)->count;
    KFSp_ThrowIf(SEQ_ReserveSpace(count, to));
    unsigned char* place = KFSp_GetRoom(to, count);
    if (!place) return false;
    unsigned char const* source = (*from)->items;
    int const numbers = layout.data / 8;
    for (int i = 0; i < count; ++i, place += (*to)->stride, source += (*from)->stride)
        if (numbers == 5)  // the most: one dimension, without a loop
            TurnRecord(place, source, 5, sixthBits);
        else
            TurnRecord(place, source, numbers, sixthBits);
    KFSp_TakeRoom(to, count);
    return true;
}

// A client's bytes are in the client's own order.
void SwapData(Layout const& layout, void* data)
{
    if (layout.custom) return;
    auto* const bytes = static_cast<unsigned char*>(data);
    for (int offset = 0; offset + 8 <= layout.data; offset += 8)
        Q_FpLongSwap(reinterpret_cast<double*>(bytes + offset));
}

void SwapRecord(Layout const& layout, KFS_KeyScalarDisk* record)
{
    record->time = static_cast<int>(Q_LongSwap(static_cast<unsigned int>(record->time)));
    record->flags = Q_ShortSwap(record->flags);
    if (layout.spatial) {
        record->spFlags = Q_LongSwap(record->spFlags);
        for (double* const number :
             {&record->arcLength, &record->inSpeed, &record->inInfluence, &record->outSpeed, &record->outInfluence})
            Q_FpLongSwap(number);
    }
    SwapData(layout, reinterpret_cast<char*>(record) + layout.diskHead);
}

// The first 8 bytes are the same in both layouts; then the fields that only differ in where they stand. `From` and `To`
// are one record type each.
template <class From, class To>
void CopyHead(bool spatial, From const* from, To* to)
{
    std::memcpy(static_cast<void*>(to), from, KFS_KeyHeadSize);
    if (spatial) {
        to->spFlags = from->spFlags;
        to->arcLength = from->arcLength;
        to->inSpeed = from->inSpeed;
        to->inInfluence = from->inInfluence;
        to->outSpeed = from->outSpeed;
        to->outInfluence = from->outInfluence;
    }
}

// Pointers are left out both ways: in a file they mean nothing, and who takes one from there hands it to a client.
void ToDiskRecord(Layout const& layout, void const* key, void* record)
{
    std::memset(record, 0, static_cast<std::size_t>(layout.DiskSize()));
    CopyHead(layout.spatial, static_cast<KFS_KeyScalar const*>(key), static_cast<KFS_KeyScalarDisk*>(record));
    if (!layout.pointers)
        std::memcpy(static_cast<char*>(record) + layout.diskHead, static_cast<char const*>(key) + layout.memoryHead,
                    static_cast<std::size_t>(layout.data));
    SwapRecord(layout, static_cast<KFS_KeyScalarDisk*>(record));
}

// `record` is swapped, and holds `recordSize` bytes, at least the head; `key` is zero throughout, and stays without an
// arc table.
void FromDiskRecord(Layout const& layout, void const* record, int recordSize, void* key, int keySize)
{
    auto* const memory = static_cast<KFS_KeyScalar*>(key);
    CopyHead(layout.spatial, static_cast<KFS_KeyScalarDisk const*>(record), memory);
    if (!layout.pointers) {
        int const dataSize = std::min(recordSize - layout.diskHead, keySize - layout.memoryHead);
        std::memcpy(static_cast<char*>(key) + layout.memoryHead, static_cast<char const*>(record) + layout.diskHead,
                    static_cast<std::size_t>(dataSize));
    }
    // The layout is the stream's, whatever a file's flag says: were it believed, numbers would pass for an arc table.
    KFSp_ThrowIf(KFSp_SetKeySpatialState(nullptr, layout.spatial ? 1 : 0, 0, key));
}

// A new key list of the stream, in the place of the one that it may have had.
SEQ_Head** MakeKeyList(KFS_Stream* stream)
{
    KFSp_DropKeyList(stream);
    KFSp_ThrowIf(KFSp_CreateKeyList(stream));
    return stream->GetKeys();
}

void CheckDiskSize(KFS_Stream const* stream, Layout const& layout, int diskSize)
{
    if (!stream->IsCustomValuePointer() && layout.DiskSize() > diskSize) {
        Q_ReportError(ReadKeysReportId, Q_SeverityWarning, Q_ZStringToUTF16String(TooSmallText));
        throw int{MissingDataCode};
    }
}

void ReportIfTooBig(int diskSize, int keySize)
{
    if (diskSize > keySize) Q_ReportError(ReadKeysReportId, Q_SeverityError, Q_ZStringToUTF16String(TooBigText));
}

}  // namespace

void KFSp_DropKeyList(KFS_Stream* stream)
{
    SEQ_Head** const keys = stream->GetKeys();
    stream->SetKeys(nullptr);
    KFSp_DisposeKeyList(keys);
    for (int* const stale : {stream->GetInvalidKeyIndexForModify(), stream->GetArcInvalidKeyIndexForModify()}) {
        stale[0] = KFS_INVALID_INDEX;
        stale[1] = KFS_INVALID_INDEX;
    }
}

int KFSp_CreateKeyDiskList(KFS_Stream* stream, SEQ_Head**& list)
{
    list = nullptr;
    SEQ_Head** made = nullptr;
    if (int const code = SEQ_New(0, static_cast<short>(Layout(stream).DiskSize()), 4, 1, &made)) return code;
    SEQ_Funcs const funcs{nullptr, nullptr, KFSp_SortKeyItemDiskFunc};
    KFSp_FirstError error;
    error.Keep(SEQ_SetRefcon(stream, made));
    error.Keep(SEQ_SetFuncs(made, 3, &funcs));
    if (error.None())
        list = made;
    else
        static_cast<void>(SEQ_Dispose(made, 0));
    return error.Code();
}

void KFSp_ConvertToKeyDiskList(KFS_Stream const* stream, SEQ_Head** list)
{
    SEQ_Head const* const* const keys = stream->GetKeys();
    if (!keys) return;
    Layout const layout(stream);
    int const count = (*keys)->count;
    if (DiffersInByteOrderOnly(layout) && (*list)->count == 0 && TurnRecords(layout, keys, list, 0xFF)) return;
    KFSp_ThrowIf(SEQ_SetNumItems(count, list, 0));
    KFSp_FirstError error;
    KFSp_ScPin const pin(list, error);
    KFSp_ThrowIf(error.Code());
    for (int i = 0; i < count; ++i) {
        void* record = nullptr;
        void const* key = nullptr;
        KFSp_ThrowIf(SEQ_GetAddress(list, i, 0, &record));
        KFSp_ThrowIf(SEQ_GetConstAddress(keys, i, &key));
        ToDiskRecord(layout, key, record);
    }
}

void KFSp_ConvertFromKeyDiskList(KFS_Stream* stream, SEQ_Head** list)
{
    Layout const layout(stream);
    int const count = (*list)->count;
    int const diskSize = SEQ_GetItemSize(list);
    CheckDiskSize(stream, layout, diskSize);
    SEQ_Head** const keys = MakeKeyList(stream);
    int const keySize = SEQ_GetItemSize(keys);
    bool const same = DiffersInByteOrderOnly(layout) && diskSize == layout.DiskSize() && diskSize == keySize;
    // The layout is the stream's, whatever a file's flag says, as in FromDiskRecord.
    if (same && TurnRecords(layout, list, keys, ~KFS_KeyFlag_SpatialBlock)) return stream->SetKeys(keys);
    KFSp_ThrowIf(SEQ_SetNumItems(count, keys, 0));
    KFSp_FirstError error;
    KFSp_ScPin const diskPin(list, error);
    KFSp_ScPin const pin(keys, error);
    KFSp_ThrowIf(error.Code());
    ReportIfTooBig(diskSize, keySize);
    // A record that is shorter than the stream's own, which the check lets pass for pointers, counts as ending in
    // zeros.
    int const recordSize = std::max(diskSize, layout.DiskSize());
    std::vector<double> scratch((static_cast<std::size_t>(recordSize) + 7) / 8);
    auto* const bytes = reinterpret_cast<char*>(scratch.data());
    for (int i = 0; i < count; ++i) {
        void const* record = nullptr;
        void* key = nullptr;
        KFSp_ThrowIf(SEQ_GetConstAddress(list, i, &record));
        KFSp_ThrowIf(SEQ_GetAddress(keys, i, 0, &key));
        std::memcpy(bytes, record, static_cast<std::size_t>(diskSize));
        std::memset(bytes + diskSize, 0, static_cast<std::size_t>(recordSize - diskSize));
        SwapRecord(layout, reinterpret_cast<KFS_KeyScalarDisk*>(bytes));
        FromDiskRecord(layout, bytes, recordSize, key, keySize);
    }
    stream->SetKeys(keys);
}

int KFSp_KeyScalarDataSwap(KFS_Stream const* stream, KFS_KeyScalar* record)
{
    Layout const layout(stream);
    SwapData(layout, reinterpret_cast<char*>(record) + layout.memoryHead);
    return 0;
}
