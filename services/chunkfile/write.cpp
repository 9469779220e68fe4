#include "services/chunkfile/file_private.h"
#include "services/chunkfile/text_private.h"

namespace {

int WriteAtom(CKFp_Writer& writer, int id, void const* data, std::size_t size)
{
    if (size <= CKFp_Writer::MostBytesOfSmallAtom) return writer.WriteSmallAtom(id, data, size);
    if (int const code = writer.BeginAtom(id, size)) return code;
    if (int const code = writer.Append(data, size)) return code;
    return writer.EndAtom(size);
}

int WriteText(CKF_File* file, int id, u16str const& text, unsigned long maxLength)
{
    return CKFp_WithWriter(
        file,
        [&](CKFp_Writer& writer) {
            std::string const bytes = maxLength == 0 ? CKFp_ToUtf8(text) : CKFp_ToUtf8(CKFp_CutText(text, maxLength));
            return WriteAtom(writer, id, bytes.data(), bytes.size());
        });
}

}  // namespace

int CKF_WriteAtom(CKF_File* file, int id, int size, void const* data)
{
    return CKFp_WithWriter(
        file,
        [&](CKFp_Writer& writer) {
            if (size < 0 || (size > 0 && !data))
                return CKFp_FailureOf(file).Set(CKF_Err_BadArgument, 0, "atom \"%s\" without its data",
                                                CKFp_IdText(id).text);
            return WriteAtom(writer, id, data, static_cast<std::size_t>(size));
        });
}

int CKF_BeginChunkWrite(CKF_File* file, int id, int, int listType, CKF_ChunkInfo* chunk)
{
    return CKFp_WithWriter(
        file,
        [&](CKFp_Writer& writer) {
            if (id != CKF_ListId || !chunk)
                return CKFp_FailureOf(file).Set(CKF_Err_BadArgument, 0, "chunk \"%s\" can't hold chunks",
                                                CKFp_IdText(id).text);
            return writer.BeginList(listType, chunk);
        });
}

int CKF_EndChunkWrite(CKF_File* file, CKF_ChunkInfo* chunk)
{
    return CKFp_WithWriter(
        file,
        [&](CKFp_Writer& writer) {
            if (!chunk)
                return CKFp_FailureOf(file).Set(CKF_Err_BadArgument, 0, "a list is closed without its description");
            return writer.EndList(chunk);
        });
}

CKF_ScWriteList::CKF_ScWriteList(CKF_File* file, int listType, int sizeHint) : file_(file)
{
    if (int const code = CKF_BeginChunkWrite(file, CKF_ListId, sizeHint, listType, &chunk_)) throw code;
}

CKF_ScWriteList::~CKF_ScWriteList()
{
    static_cast<void>(CKF_EndChunkWrite(file_, &chunk_));  // the file keeps what fails
}

int CKF_WriteHandle(CKF_File* file, int id, char** handle)
{
    return CKFp_WithWriter(
        file,
        [&](CKFp_Writer& writer) {
            if (!handle)
                return CKFp_FailureOf(file).Set(CKF_Err_BadArgument, 0, "atom \"%s\" without a handle",
                                                CKFp_IdText(id).text);
            return WriteAtom(writer, id, *handle, Q_GetHandleSize(handle));
        });
}

int CKF_WriteUTF16(CKF_File* file, u16str const& text)
{
    if (int const code = WriteText(file, CKF_Utf16Id, text, 0)) throw code;
    return 0;
}

int CKF_WriteString(CKF_File* file, int id, u16str const& text, unsigned long maxLength)
{
    return WriteText(file, id, text, maxLength);
}
