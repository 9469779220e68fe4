#include "services/chunkfile/layout_private.h"

#include <algorithm>

namespace {

char const* ParseOutermost(CKFp_Bytes bytes, std::uint64_t position, CKFp_Chunk* chunk) noexcept
{
    if (position > 0) {
        *chunk = {};
        chunk->offset = chunk->data = position;
        chunk->end = chunk->next = bytes.size();
        return "behind the end of the outer form";
    }
    char const* const problem = CKFp_ParseChunk(bytes, position, bytes.size(), chunk);
    return chunk->id == CKFp_FormId ? problem : "not the outer form of a project file";
}

char const* ParseInner(CKFp_Bytes bytes, std::uint64_t position, std::uint64_t limit, CKFp_Chunk* chunk) noexcept
{
    char const* const problem = CKFp_ParseChunk(bytes, position, limit, chunk);
    return chunk->id == CKFp_FormId ? "an outer form inside the file" : problem;
}

}  // namespace

CKF_ChunkWalk::CKF_ChunkWalk(std::span<unsigned char const> bytes) noexcept : bytes_(bytes) {}

bool CKF_ChunkWalk::Next(CKF_RawChunk* chunk) noexcept
{
    auto const limit = [&] { return open_ > 0 ? ends_[open_ - 1] : bytes_.size(); };
    while (open_ > 0 && position_ >= limit()) {
        std::uint64_t const end = ends_[--open_];
        // Chunks begin at even places, so one with an odd end is followed by padding, as far as its parent has any.
        position_ = std::min<std::uint64_t>(end + (end & 1), limit());
    }
    if (position_ >= bytes_.size()) return false;

    CKFp_Chunk parsed;
    char const* problem =
        open_ == 0 ? ParseOutermost(bytes_, position_, &parsed) : ParseInner(bytes_, position_, limit(), &parsed);
    bool const holdsChunks =
        parsed.id == (open_ == 0 ? CKFp_FormId : CKF_ListId) && parsed.data >= parsed.offset + CKFp_ListHeaderSize;
    bool const tooDeep = holdsChunks && open_ > CKF_MaxDepth;
    if (tooDeep && !problem) problem = "nested too deeply";

    *chunk = {parsed.id,      parsed.listType, parsed.offset,
              parsed.claimed, open_,           bytes_.subspan(parsed.data, parsed.Size()),
              problem};
    sound_ = sound_ && !problem;
    position_ = parsed.next;
    if (holdsChunks && !tooDeep) {
        ends_[open_++] = parsed.end;
        position_ = parsed.data;
    }
    return true;
}
