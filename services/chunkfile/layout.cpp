#include "services/chunkfile/layout_private.h"

#include <algorithm>

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
    const std::uint64_t room = limit - chunk->data;
    const std::uint64_t length = std::min<std::uint64_t>(chunk->claimed, room);
    const bool fits = chunk->claimed <= room;
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
