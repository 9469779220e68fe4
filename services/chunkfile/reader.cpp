#include "services/chunkfile/reader_private.h"

#include <algorithm>
#include <cstring>

int CKFp_Reader::Start(CKFp_Version* version) noexcept
{
    if (bytes_.size() > UINT32_MAX)
        return failure_.Set(CKF_Err_TooBig, UINT32_MAX, "the file is bigger than a project file can be");
    CKFp_Chunk form;
    if (bytes_.size() < CKFp_ListHeaderSize || CKFp_Get32(bytes_.data()) != static_cast<std::uint32_t>(CKFp_FormId))
        return failure_.Set(CKF_Err_NotAChunkFile, 0, "this isn't a project file");
    if (char const* const problem = CKFp_ParseChunk(bytes_, 0, bytes_.size(), &form))
        return failure_.Set(CKF_Err_Corrupt, 0, "the project file is cut short: its outer form is %s", problem);
    if (form.listType != CKFp_FormType)
        return failure_.Set(CKF_Err_NotAChunkFile, CKFp_HeaderSize, "this isn't a project file, its type is \"%s\"",
                            CKFp_IdText(form.listType).text);
    if (form.next != bytes_.size())
        return failure_.Set(CKF_Err_Corrupt, form.next, "the project file goes on behind its end");
    levels_[0] = {form, {}, 0};
    position_ = form.data;

    CKFp_Chunk record;
    if (position_ == form.end || CKFp_ParseChunk(bytes_, position_, form.end, &record) || record.id != CKFp_VersionId ||
        record.Size() < CKFp_VersionSize)
        return failure_.Set(CKF_Err_NotAChunkFile, position_, "the project file doesn't begin with its version");
    *version = CKFp_GetVersion(Take(record).data());
    return 0;
}

bool CKFp_Reader::IsTop(CKF_ChunkInfo const& info) noexcept
{
    return info.depth == open_ && info.offset == Top().chunk.data;
}

int CKFp_Reader::CheckLevel(CKF_ChunkInfo const* parent) noexcept
{
    if (parent && !IsTop(*parent))
        return failure_.Set(CKF_Err_Unbalanced, position_, "a search in a list that isn't the innermost open one");
    if (!Top().chunk.IsList())
        return failure_.Set(CKF_Err_BadArgument, position_, "a search inside the atom \"%s\"",
                            CKFp_IdText(Top().chunk.id).text);
    return 0;
}

bool CKFp_Reader::Level::IsKnownMissing(int id, int listType) const noexcept
{
    auto const known = missing.begin() + std::min<std::ptrdiff_t>(missingCount, std::ssize(missing));
    return std::any_of(missing.begin(), known,
                       [&](Missing const& entry) { return entry.id == id && entry.listType == listType; });
}

void CKFp_Reader::Level::RememberMissing(int id, int listType) noexcept
{
    missing[missingCount++ % missing.size()] = {id, listType};
}

int CKFp_Reader::Find(int id, int listType, CKF_ChunkInfo const* parent, CKFp_Chunk* found) noexcept
{
    if (int const code = CheckLevel(parent)) return code;
    Level& level = Top();
    // The position of a level only goes forward, so what was missing once stays missing.
    if (level.IsKnownMissing(id, listType)) return CKF_Err_NoSuchChunk;
    for (std::uint64_t at = position_; at < level.chunk.end; at = found->next) {
        if (char const* const problem = CKFp_ParseChunk(bytes_, at, level.chunk.end, found))
            return failure_.Set(CKF_Err_Corrupt, at, "the project file is damaged: chunk \"%s\" is %s",
                                CKFp_IdText(found->id).text, problem);
        if (found->id == CKFp_FormId)
            return failure_.Set(CKF_Err_Corrupt, at, "the project file is damaged: there is a file inside the file");
        if ((id == 0 || found->id == id) && (listType == 0 || found->listType == listType)) return 0;
    }
    level.RememberMissing(id, listType);
    return CKF_Err_NoSuchChunk;
}

CKFp_Bytes CKFp_Reader::Take(CKFp_Chunk const& chunk) noexcept
{
    position_ = chunk.next;
    return bytes_.subspan(chunk.data, chunk.Size());
}

int CKFp_Reader::Enter(CKFp_Chunk const& chunk, CKF_ChunkInfo* info) noexcept
{
    if (chunk.IsList() && open_ == CKF_MaxDepth)
        return failure_.Set(CKF_Err_TooDeep, chunk.offset, "the project file nests more than %d lists", CKF_MaxDepth);
    ++open_;
    Top() = {chunk, {}, 0};
    position_ = chunk.data;
    *info = {static_cast<std::uint32_t>(chunk.data), chunk.id, chunk.Size(), chunk.listType, open_};
    return 0;
}

void CKFp_Reader::Leave(CKF_ChunkInfo const& info) noexcept
{
    if (info.depth < 1 || info.depth > open_) return;
    open_ = info.depth;
    if (!IsTop(info)) return;
    position_ = Top().chunk.next;
    --open_;
}

int CKFp_Reader::Read(std::size_t size, void* buffer) noexcept
{
    if (Top().chunk.IsList())
        return failure_.Set(CKF_Err_BadArgument, position_, "data is read where no atom is entered");
    std::uint64_t const left = Top().chunk.end - position_;
    if (size > left)
        return failure_.Set(CKF_Err_PastEnd, position_, "%zu bytes are read where chunk \"%s\" has %llu left", size,
                            CKFp_IdText(Top().chunk.id).text, static_cast<unsigned long long>(left));
    if (size > 0) std::memcpy(buffer, bytes_.data() + position_, size);
    position_ += size;
    return 0;
}
