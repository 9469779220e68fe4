#include "services/chunkfile/layout_private.h"

#include <algorithm>

CKFp_Version CKFp_GetVersion(unsigned char const* record) noexcept
{
    return {static_cast<std::int32_t>(CKFp_Get32(record)), static_cast<std::int32_t>(CKFp_Get32(record + 4)),
            static_cast<std::int32_t>(CKFp_Get32(record + 8))};
}

void CKFp_PutVersion(unsigned char* record, CKFp_Version const& version) noexcept
{
    CKFp_Put32(record, static_cast<std::uint32_t>(version.major));
    CKFp_Put32(record + 4, static_cast<std::uint32_t>(version.minor));
    CKFp_Put32(record + 8, static_cast<std::uint32_t>(version.encoding));
}

char const* CKFp_ParseChunk(CKFp_Bytes bytes, std::uint64_t offset, std::uint64_t limit, CKFp_Chunk* chunk) noexcept
{
    *chunk = {};
    chunk->offset = chunk->data = offset;
    chunk->end = chunk->next = limit;
    if (limit - offset < CKFp_HeaderSize) return "too short for the header of a chunk";

    unsigned char const* const header = bytes.data() + offset;
    chunk->id = static_cast<int>(CKFp_Get32(header));
    chunk->claimed = CKFp_Get32(header + CKFp_LengthOffset);
    chunk->data = offset + CKFp_HeaderSize;
    std::uint64_t const room = limit - chunk->data;
    std::uint64_t const length = std::min<std::uint64_t>(chunk->claimed, room);
    bool const fits = chunk->claimed <= room;
    chunk->end = chunk->data + length;
    if (chunk->IsList()) {
        if (length < 4) return "a list that is too short for its type";
        chunk->listType = static_cast<int>(CKFp_Get32(header + CKFp_HeaderSize));
        chunk->data += 4;
        chunk->claimed -= 4;
    }
    if (!fits) return "longer than what contains it";
    chunk->next = chunk->end + (length & 1);
    if (chunk->next > limit) {
        chunk->next = limit;
        return "without its padding byte";
    }
    return nullptr;
}
