#include "services/chunkfile/file_private.h"
#include "services/chunkfile/text_private.h"

#include <algorithm>
#include <cstring>

namespace {

int FailWithoutPlace(CKF_File* file, int id) noexcept
{
    return CKFp_FailureOf(file).Set(CKF_Err_BadArgument, 0, "atom \"%s\" is read without a place for it",
                                    CKFp_IdText(id).text);
}

// Finds an atom and hands its data to `use`.
template <class Use>
int ReadAtom(CKF_File* file, int id, CKF_ChunkInfo const* parent, Use use)
{
    return CKFp_WithReader(
        file,
        [&](CKFp_Reader& reader) {
            if (!CKFp_IsAtomId(id)) return CKFp_FailureOf(file).SetBadAtomId(id, reader.Position());
            CKFp_Chunk chunk;
            if (int const code = reader.Find(id, 0, parent, &chunk)) return code;
            return use(reader.Take(chunk));
        });
}

int ReadText(CKF_File* file, int id, CKF_ChunkInfo const* parent, unsigned long maxLength, u16str* text)
{
    return ReadAtom(
        file, id, parent,
        [&](CKFp_Bytes bytes) {
            if (!text) return FailWithoutPlace(file, id);
            *text = CKFp_CutText(CKFp_FromUtf8(bytes), maxLength);
            return 0;
        });
}

}  // namespace

int CKF_ReadAtom(CKF_File* file, int id, CKF_ChunkInfo const* parent, int size, void* buffer)
{
    return ReadAtom(
        file, id, parent,
        [&](CKFp_Bytes bytes) {
            if (size < 0 || (size > 0 && !buffer)) return FailWithoutPlace(file, id);
            std::size_t const count = std::min(static_cast<std::size_t>(size), bytes.size());
            if (count > 0) std::memcpy(buffer, bytes.data(), count);
            return 0;
        });
}

int CKF_ReadHandle(CKF_File* file, CKF_ChunkInfo const* parent, int id, char*** handle)
{
    return ReadAtom(
        file, id, parent,
        [&](CKFp_Bytes bytes) {
            if (!handle) return FailWithoutPlace(file, id);
            char** const made = Q_AllocateHandleClear(CKFp_AllocationId, "chunk handle", bytes.size());
            if (!made) throw std::bad_alloc();
            if (!bytes.empty()) std::memcpy(*made, bytes.data(), bytes.size());
            *handle = made;
            return 0;
        });
}

CKF_ScDescend::CKF_ScDescend(CKF_File* file, int id, int listType, CKF_ChunkInfo const* parent, bool* found)
{
    Descend(file, id, listType, parent, found);
}

void CKF_ScDescend::Descend(CKF_File* file, int id, int listType, CKF_ChunkInfo const* parent, bool* found)
{
    int const code = CKFp_WithReader(file, [&](CKFp_Reader& reader) {
        if (file_) return CKFp_FailureOf(file).Set(CKF_Err_Unbalanced, reader.Position(), "a descent is used twice");
        CKFp_Chunk chunk;
        if (int const missing = reader.Find(id, listType, parent, &chunk)) return missing;
        return reader.Enter(chunk, &chunk_);
    });
    if (found) *found = code == 0;
    if (code == 0)
        file_ = file;
    else if (!found || code != CKF_Err_NoSuchChunk)
        throw code;
}

CKF_ScDescend::~CKF_ScDescend()
{
    if (!file_) return;
    if (CKFp_Reader* const reader = CKFp_Access::ImplOf(*file_).reader.get()) reader->Leave(chunk_);
}

CKF_ScDescendList::CKF_ScDescendList(CKF_File* file, int listType, CKF_ChunkInfo const* parent, bool* found)
    : CKF_ScDescend(file, CKF_ListId, listType, parent, found)
{}

int CKF_ReadChunkData(CKF_File* file, int* size, void* buffer)
{
    return CKFp_WithReader(
        file,
        [&](CKFp_Reader& reader) {
            if (!size || *size < 0 || (*size > 0 && !buffer))
                return CKFp_FailureOf(file).Set(CKF_Err_BadArgument, reader.Position(), "data is read without a place");
            return reader.Read(static_cast<std::size_t>(*size), buffer);
        });
}

void CKF_ReadUTF16(CKF_File* file, u16str* text, CKF_ChunkInfo const* parent)
{
    if (int const code = ReadText(file, CKF_Utf16Id, parent, 0, text)) throw code;
}

bool CKF_ReadString(CKF_File* file, CKF_ChunkInfo const* parent, int id, u16str* out, u16str const& fallback,
                    unsigned long maxLength)
{
    int const code = ReadText(file, id, parent, maxLength, out);
    if (code == 0) return true;
    if (code != CKF_Err_NoSuchChunk) throw code;
    if (out) *out = fallback;
    return false;
}
