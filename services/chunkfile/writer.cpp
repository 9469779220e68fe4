#include "services/chunkfile/writer_private.h"

#include <cstring>

int CKFp_Writer::CheckRoom(std::uint64_t size)
{
    std::uint64_t const present = sink_->Size();
    if (present > maxSize_ || size > maxSize_ - present)
        return failure_.Set(CKF_Err_TooBig, present, "the project doesn't fit into a file of %u bytes", maxSize_);
    return 0;
}

int CKFp_Writer::Start()
{
    unsigned char prelude[CKFp_PreludeSize] = {};
    CKFp_PutHeader(prelude, CKFp_FormId, 0);
    CKFp_Put32(prelude + CKFp_HeaderSize, static_cast<std::uint32_t>(CKFp_FormType));
    CKFp_PutHeader(prelude + CKFp_ListHeaderSize, CKFp_VersionId, CKFp_VersionSize);
    if (int const code = CheckRoom(sizeof prelude)) return code;
    return Append(prelude, sizeof prelude);
}

int CKFp_Writer::Commit(CKFp_Version const& version)
{
    if (open_ > 0) return failure_.Set(CKF_Err_Unbalanced, sink_->Size(), "%d lists were not closed", open_);
    if (int const code = PatchLength(CKFp_ListHeaderSize)) return code;
    unsigned char record[CKFp_VersionSize];
    CKFp_PutVersion(record, version);
    if (int const code = sink_->Patch(CKFp_VersionOffset, record, sizeof record)) return code;
    return sink_->Commit();
}

int CKFp_Writer::BeginAtom(int id, std::uint64_t size)
{
    if (!CKFp_IsAtomId(id)) return failure_.SetBadAtomId(id, sink_->Size());
    if (int const code = CheckRoom(CKFp_HeaderSize + size + (size & 1))) return code;
    unsigned char header[CKFp_HeaderSize];
    CKFp_PutHeader(header, id, static_cast<std::uint32_t>(size));
    return Append(header, sizeof header);
}

int CKFp_Writer::WriteSmallAtom(int id, void const* data, std::size_t size)
{
    if (!CKFp_IsAtomId(id)) return failure_.SetBadAtomId(id, sink_->Size());
    std::size_t const padded = CKFp_HeaderSize + size + (size & 1);
    if (int const code = CheckRoom(padded)) return code;
    unsigned char piece[CKFp_HeaderSize + MostBytesOfSmallAtom + 1];
    CKFp_PutHeader(piece, id, static_cast<std::uint32_t>(size));
    if (size > 0) std::memcpy(piece + CKFp_HeaderSize, data, size);
    piece[CKFp_HeaderSize + size] = 0;
    return Append(piece, padded);
}

int CKFp_Writer::EndAtom(std::uint64_t size)
{
    constexpr unsigned char padding = 0;
    return Append(&padding, size & 1);
}

int CKFp_Writer::BeginList(int listType, CKF_ChunkInfo* chunk)
{
    if (listType == 0) return failure_.Set(CKF_Err_BadArgument, sink_->Size(), "a list without a type");
    if (open_ == CKF_MaxDepth)
        return failure_.Set(CKF_Err_TooDeep, sink_->Size(), "the project nests more than %d lists", CKF_MaxDepth);
    if (int const code = CheckRoom(CKFp_ListHeaderSize)) return code;
    unsigned char header[CKFp_ListHeaderSize];
    CKFp_PutHeader(header, CKF_ListId, 0);
    CKFp_Put32(header + CKFp_HeaderSize, static_cast<std::uint32_t>(listType));
    if (int const code = Append(header, sizeof header)) return code;
    std::uint32_t const data = static_cast<std::uint32_t>(sink_->Size());
    data_[static_cast<std::size_t>(open_++)] = data;
    *chunk = {data, CKF_ListId, 0, listType, open_};
    return 0;
}

// The length of a list counts its type, which stands in front of the data.
int CKFp_Writer::PatchLength(std::uint64_t data)
{
    unsigned char length[4];
    CKFp_Put32(length, static_cast<std::uint32_t>(sink_->Size() - data + 4));
    return sink_->Patch(data - CKFp_ListHeaderSize + CKFp_LengthOffset, length, sizeof length);
}

int CKFp_Writer::EndList(CKF_ChunkInfo* chunk)
{
    if (open_ == 0 || chunk->depth != open_ || chunk->offset != data_[static_cast<std::size_t>(open_ - 1)])
        return failure_.Set(CKF_Err_Unbalanced, sink_->Size(), "a list is closed that isn't the innermost open one");
    if (int const code = PatchLength(chunk->offset)) return code;
    --open_;
    chunk->size = static_cast<std::uint32_t>(sink_->Size() - chunk->offset);
    return 0;
}
