#include "services/chunkfile/file_private.h"
#include "services/sequence/list_private.h"

#include <cstring>

namespace {

constexpr int ListChunkId = CKF_Id("seql");
constexpr std::size_t HeadSize = 8;  // item size, count
constexpr std::size_t MostBytesBehindHead = 1 << 12;

int WriteItems(CKFp_Writer& writer, SEQ_Head const& head)
{
    std::size_t const itemSize = static_cast<std::size_t>(head.itemSize);
    if (head.itemSize == head.stride) return writer.Append(head.items, SEQp_Bytes(head, head.count));
    // What fills the gaps between items in memory isn't part of the list.
    for (int i = 0; i < head.count; ++i)
        if (int const code = writer.Append(SEQp_Item(head, i), itemSize)) return code;
    return 0;
}

int MakeList(CKFp_Bytes items, short itemSize, int count, SEQ_Head*** list)
{
    SEQ_Head** made = nullptr;
    // Short ones in one block: what is read is mostly looked at once and disposed.
    if (count > 0 && items.size() <= MostBytesBehindHead) {
        if (int const code = SEQp_NewInOneBlock(itemSize, count, &made)) return code;
    } else {
        if (int const code = SEQ_New(0, itemSize, 4, 1, &made)) return code;
        if (int const code = count > 0 ? SEQp_SetCapacity(**made, count) : 0) {
            static_cast<void>(SEQ_Dispose(made, 0));  // the first error wins
            return code;
        }
        (*made)->count = count;
    }
    std::size_t const size = static_cast<std::size_t>(itemSize);
    if (itemSize == (*made)->stride) {
        if (count > 0) std::memcpy((*made)->items, items.data(), items.size());
    } else {
        for (int i = 0; i < count; ++i)
            std::memcpy(SEQp_Item(**made, i), items.data() + static_cast<std::size_t>(i) * size, size);
    }
    *list = made;
    return 0;
}

}  // namespace

int SEQ_Write(SEQ_Head const* const* list, CKF_File* file)
{
    return CKFp_WithWriter(
        file,
        [&](CKFp_Writer& writer) {
            if (!SEQp_IsList(list)) return CKFp_FailureOf(file).Set(SEQ_Err_BadList, 0, "no list to write");
            SEQ_Head const& head = **list;
            std::uint64_t const size =
                HeadSize + static_cast<std::uint64_t>(head.count) * static_cast<std::uint64_t>(head.itemSize);
            unsigned char numbers[HeadSize];
            CKFp_Put32(numbers, static_cast<std::uint32_t>(head.itemSize));
            CKFp_Put32(numbers + 4, static_cast<std::uint32_t>(head.count));
            if (int const code = writer.BeginAtom(ListChunkId, size)) return code;
            if (int const code = writer.Append(numbers, sizeof numbers)) return code;
            if (int const code = WriteItems(writer, head)) return code;
            return writer.EndAtom(size);
        });
}

int SEQ_Read(CKF_File* file, SEQ_Head*** list)
{
    return CKFp_WithReader(
        file,
        [&](CKFp_Reader& reader) {
            if (!list) return CKFp_FailureOf(file).Set(SEQ_Err_BadArgument, reader.Position(), "no place for a list");
            CKFp_Chunk chunk;
            if (int const code = reader.Find(ListChunkId, 0, nullptr, &chunk)) return code;
            CKFp_Bytes const bytes = reader.Take(chunk);
            auto const bad = [&] {
                return CKFp_FailureOf(file).Set(
                    SEQ_Err_BadChunk, chunk.offset,
                    "the project file is damaged: a list doesn't hold the items that it claims");
            };
            if (bytes.size() < HeadSize) return bad();
            std::uint32_t const itemSize = CKFp_Get32(bytes.data());
            std::uint32_t const count = CKFp_Get32(bytes.data() + 4);
            CKFp_Bytes const items = bytes.subspan(HeadSize);
            if (itemSize == 0 || itemSize > INT16_MAX || count > INT32_MAX) return bad();
            if (items.size() / itemSize != count || items.size() % itemSize != 0) return bad();
            int const code = MakeList(items, static_cast<short>(itemSize), static_cast<int>(count), list);
            return code == 0
                       ? 0
                       : CKFp_FailureOf(file).Set(code, chunk.offset, "a list can't be made from the project file");
        });
}
