// Project files: a tree of chunks in a big-endian container, for reading and for writing.
//
// A chunk has a four-letter id and a length. A "LIST" also has a list type and holds chunks; every other chunk, an
// atom, holds bytes. Ids are ints whose four bytes, most significant first, spell them: CKF_Id("kfbs"). Bytes of an
// atom are written and read as they come; who calls swaps. docs/file-format.md has the layout and a worked example.
//
// Errors   A CKF_File remembers the first failure: every later operation on it does nothing and gives the same code, so
//          a save whose calls were never looked at still fails at Commit, and a broken file is broken from the first
//          bad byte on. Only the answer that a chunk isn't there, CKF_Err_NoSuchChunk, is no failure. What the service
//          throws is such a code, as an int.
// Hostile  Nothing of a file is trusted. A length is held against what its parent has left before anything is
// files    allocated or read, lists nest at most CKF_MaxDepth deep, and a search that found nothing isn't made
//          again, so that reading costs time in proportion to the file whatever stands in it.
// Threads  One file is used by one thread at a time. No lock.
#pragma once

#include "frame/services/export.h"
#include "frame/services/filewriter.h"
#include "frame/services/strings.h"

#include <cstdint>
#include <memory>
#include <span>

struct CKF_File;

// The id that four letters spell.
constexpr int CKF_Id(char const (&letters)[5]) noexcept
{
    std::uint32_t id = 0;
    for (int i = 0; i < 4; ++i) id = (id << 8) | static_cast<unsigned char>(letters[i]);
    return static_cast<int>(id);
}

inline constexpr int CKF_ListId = CKF_Id("LIST");
inline constexpr int CKF_Utf16Id = CKF_Id("Utf8");  // the chunk of CKF_WriteUTF16

inline constexpr int CKF_MaxDepth = 128;  // lists inside lists; the writer refuses what no reader would take

// Codes of this service; 4, out of memory, is common to all services.
inline constexpr int CKF_Err_NoSuchChunk = 0x1901;    // not there; the position is what it was
inline constexpr int CKF_Err_BadArgument = 0x1902;    // a null address, a negative size, an id that isn't an atom's
inline constexpr int CKF_Err_NotOpen = 0x1903;        // the file isn't open for this direction
inline constexpr int CKF_Err_NotAChunkFile = 0x1904;  // the outer form or its version record is missing or another's
inline constexpr int CKF_Err_Corrupt = 0x1905;        // a chunk doesn't fit its parent, or the form its file
inline constexpr int CKF_Err_TooDeep = 0x1906;        // more than CKF_MaxDepth lists inside each other
inline constexpr int CKF_Err_TooBig = 0x1907;         // the file would pass 4 GiB, or the limit that the host set
inline constexpr int CKF_Err_Unbalanced = 0x1908;     // not the innermost open chunk, or still open at Commit
inline constexpr int CKF_Err_PastEnd = 0x1909;        // more bytes asked for than the chunk has left
inline constexpr int CKF_Err_Io = 0x190A;             // the operating system refused; the error text says why

// ---- versions

// The project version that this build writes, and the last major version whose text in handles is 8-bit.
inline constexpr int CKF_CurrentMajorVersion = 95;
inline constexpr int CKF_CurrentMinorVersion = 0;
inline constexpr int CKF_LastPreUnicodeMajorVersion = 71;

// How the 8-bit text in handles of an older file is encoded.
struct CKF_TextEncoding {
    int code = 0;
    bool operator==(CKF_TextEncoding const&) const = default;
};
inline constexpr CKF_TextEncoding CKF_TextEncoding_Utf8{0};
inline constexpr CKF_TextEncoding CKF_TextEncoding_Latin1{1};

// One open chunk. Made of zeroes by whoever begins a chunk and filled in by the service.
struct CKF_ChunkInfo {
    std::uint32_t offset;  // where the chunk's data begins in the file
    int id;                // as CKF_ConvertChunkIDToXMLFormat gives it
    std::uint32_t size;    // bytes of data; of a list, what follows the list type
    int listType;          // 0 for an atom
    int depth;             // lists and atoms open around it, and itself
};
static_assert(sizeof(CKF_ChunkInfo) == 20);

// ---- what a host does with files

// A project file. Open it, hand it to the library, and read LastError() or the result of Commit().
//
//     CKF_File file;                                  CKF_File file;
//     file.SetVersion(88, 3);   // if not current     if (int code = file.Open(path)) ...
//     if (int code = file.Create(path)) ...           group.Read(&file, nullptr);
//     group.Write(&file);
//     if (int code = file.Commit()) ...
struct KFS_SERVICE_API CKF_File {
    // The pair that the version gates of readers and writers see, and the encoding of 8-bit text. Open fills them in;
    // Commit writes them. To save in an older form, set them before the first chunk is written.
    std::int32_t majorVersion = CKF_CurrentMajorVersion;
    std::int32_t minorVersion = CKF_CurrentMinorVersion;
    CKF_TextEncoding textEncoding;

    CKF_File();
    // Discards what was not committed.
    ~CKF_File();
    CKF_File(CKF_File const&) = delete;
    CKF_File& operator=(CKF_File const&) = delete;

    // Each of these first closes what was open, and forgets its failure.
    //
    // Opens a file for reading. The path is read into memory at once, so the file may change or vanish afterwards; only
    // a regular file is taken. The bytes are borrowed: they must stay until the file is closed, and are not copied.
    [[nodiscard]] int Open(char const* path);
    [[nodiscard]] int Open(std::span<unsigned char const> bytes);
    // Begins a file. With a path it is written as frame/services/filewriter.h tells, so that the target, if there is
    // one, stays what it is until Commit. The hook may be null, and must outlive the file.
    [[nodiscard]] int Create(char const* path, CKF_IoHook* hook = nullptr);
    [[nodiscard]] int CreateInMemory(CKF_IoHook* hook = nullptr);

    // Ends writing: all chunks must be closed. Puts version and lengths right, flushes the temporary file to disk,
    // checks its size, renames it over the target and flushes the folder. Returns the first failure since Create, if
    // there was one; the target is then untouched and the temporary file gone. The one exception is a folder that can't
    // be flushed: the new file is in place, but may not survive a power cut.
    [[nodiscard]] int Commit();
    // Closes the file. One that was being written and not committed leaves nothing behind.
    void Close() noexcept;

    // What is open for reading, or was committed in memory. Empty otherwise. Valid until the file is closed or opened
    // again.
    std::span<unsigned char const> GetBytes() const noexcept;

    void SetVersion(int major, int minor) noexcept;
    // Whether time stamps that change without an edit go into this save. False at first, so that two saves of one
    // project are the same bytes.
    bool GetShouldWriteModificationTimes() const noexcept;
    void SetShouldWriteModificationTimes(bool wanted) noexcept;
    // A limit below the 4 GiB that the format has, for the files written from the next Create on.
    void SetMaxSize(std::uint32_t bytes) noexcept;

    // The first failure since the file was opened or created: 0 if there was none; a sentence for the user, "" if there
    // was none, valid until the file is opened or created again; and the place in the file.
    [[nodiscard]] int LastError() const noexcept;
    char const* LastErrorText() const noexcept;
    std::uint64_t LastErrorOffset() const noexcept;

    struct Impl;  // the service's own

private:
    friend struct CKFp_Access;
    std::unique_ptr<Impl> impl_;
    std::uint32_t maxSize_;
    bool writesModificationTimes_ = false;
};

// ---- writing

// Writes one atom with `size` bytes of data into the innermost open list. An odd size is padded, which no reader sees.
[[nodiscard]] KFS_SERVICE_API int CKF_WriteAtom(CKF_File* file, int id, int size, void const* data);

// Opens a list; `id` is CKF_ListId. `chunk` is filled in. The size hint is ignored: the length is what was written.
[[nodiscard]] KFS_SERVICE_API int CKF_BeginChunkWrite(CKF_File* file, int id, int sizeHint, int listType,
                                                      CKF_ChunkInfo* chunk);
// Closes it. It must be the innermost open one; CKF_Err_Unbalanced otherwise. `chunk` receives the size.
[[nodiscard]] KFS_SERVICE_API int CKF_EndChunkWrite(CKF_File* file, CKF_ChunkInfo* chunk);

// A list that is open for a scope. The constructor throws; what the destructor can't do fails the file.
class KFS_SERVICE_API CKF_ScWriteList {
public:
    CKF_ScWriteList(CKF_File* file, int listType, int sizeHint);
    ~CKF_ScWriteList();
    CKF_ScWriteList(CKF_ScWriteList const&) = delete;
    CKF_ScWriteList& operator=(CKF_ScWriteList const&) = delete;

private:
    CKF_File* file_;
    CKF_ChunkInfo chunk_{};
};

// Writes a handle's bytes as an atom.
[[nodiscard]] KFS_SERVICE_API int CKF_WriteHandle(CKF_File* file, int id, char** handle);

// Text goes into atoms as UTF-8 without a terminator. A surrogate that has no partner is written as the three bytes
// that it would have as a code point, so every text comes back unit for unit.
//
// Writes a text as a CKF_Utf16Id atom. Throws on failure; the result is 0.
KFS_SERVICE_API int CKF_WriteUTF16(CKF_File* file, u16str const& text);
// Writes a text as an atom of this id, and doesn't throw. A limit other than 0 cuts the text to that many units, and
// never a pair of surrogates in two.
[[nodiscard]] KFS_SERVICE_API int CKF_WriteString(CKF_File* file, int id, u16str const& text, unsigned long maxLength);

// A new handle with a text in the form of older files; null when out of memory. To be freed with Q_FreeHandle. It holds
// UTF-8; with `marked` a text that isn't ASCII has the three bytes EF BB BF in front, which tell a reader that the
// encoding of the file doesn't count.
KFS_SERVICE_API char** CKF_NewHandleFromString(u16str const& text, bool marked);

// ---- reading
//
// A search looks forward from the present position to the end of the innermost open list and steps over what it doesn't
// look for. One that finds nothing leaves the position where it was. `parent` is that list's info, or null; a chunk
// that isn't the innermost open one is CKF_Err_Unbalanced.

// Finds the next atom with this id and copies its data: all of it, or the first `size` bytes. What is behind the data
// of a shorter atom in the buffer stays untouched. The position is then behind the atom.
[[nodiscard]] KFS_SERVICE_API int CKF_ReadAtom(CKF_File* file, int id, CKF_ChunkInfo const* parent, int size,
                                               void* buffer);

// A chunk that is entered for a scope. Descents nest like a stack.
class KFS_SERVICE_API CKF_ScDescend {
public:
    CKF_ScDescend() noexcept = default;
    CKF_ScDescend(CKF_File* file, int id, int listType, CKF_ChunkInfo const* parent, bool* found);
    // Leaves the chunk: the file is positioned behind it, whatever was read of it.
    ~CKF_ScDescend();
    CKF_ScDescend(CKF_ScDescend const&) = delete;
    CKF_ScDescend& operator=(CKF_ScDescend const&) = delete;

    // Enters the next chunk with this id and list type; 0 stands for any. Throws on failure. A chunk that isn't there
    // is a failure only where `found` is null, and then it is CKF_Err_NoSuchChunk; otherwise `found` says whether it
    // was.
    void Descend(CKF_File* file, int id, int listType, CKF_ChunkInfo const* parent, bool* found);

    // The chunk entered, until this descent ends. All zero on an idle descent.
    CKF_ChunkInfo const* GetChunkInfo() const noexcept { return &chunk_; }

private:
    CKF_File* file_ = nullptr;
    CKF_ChunkInfo chunk_{};
};

// A descent into a list.
class KFS_SERVICE_API CKF_ScDescendList : public CKF_ScDescend {
public:
    CKF_ScDescendList(CKF_File* file, int listType, CKF_ChunkInfo const* parent, bool* found);
};

// Reads the next `*size` bytes of the atom that was entered last. CKF_Err_PastEnd if it has fewer left.
[[nodiscard]] KFS_SERVICE_API int CKF_ReadChunkData(CKF_File* file, int* size, void* buffer);

// As CKF_ReadAtom, into a new handle of the atom's size, which is freed with Q_FreeHandle. On failure `handle` is
// untouched.
[[nodiscard]] KFS_SERVICE_API int CKF_ReadHandle(CKF_File* file, CKF_ChunkInfo const* parent, int id, char*** handle);

// The text of a handle in the form of older files: UTF-8 where the mark says so, else in this encoding (null is UTF-8).
// Disposes the handle and sets it to null. A null handle is an empty text. What is ill-formed becomes U+FFFD.
KFS_SERVICE_API u16str CKF_ConvertHandleToStringAndDisposeIfEncoded(char*** handle, CKF_TextEncoding const* encoding);

// The reverse of CKF_WriteUTF16. Throws, CKF_Err_NoSuchChunk included.
KFS_SERVICE_API void CKF_ReadUTF16(CKF_File* file, u16str* text, CKF_ChunkInfo const* parent);
// The reverse of CKF_WriteString: true and the text, or false and the fallback where there is no such chunk. Any other
// failure is thrown.
KFS_SERVICE_API bool CKF_ReadString(CKF_File* file, CKF_ChunkInfo const* parent, int id, u16str* out,
                                    u16str const& fallback, unsigned long maxLength);

// ---- versions and ids

// The form of an id that CKF_ChunkInfo::id has. This container has one form only, so it is the id itself.
[[nodiscard]] KFS_SERVICE_API int CKF_ConvertChunkIDToXMLFormat(int id, int* out);

// Replaces a file's version pair by the pair that version gates are to see. A pair up to the current one is its own; a
// newer file is read as a current one, since that is all this build knows, and a negative number counts as 0.
KFS_SERVICE_API void CKF_GetEffectiveProjectVersion(int* major, int* minor);

// Whether text in handles is 8-bit in this file: major versions up to CKF_LastPreUnicodeMajorVersion.
KFS_SERVICE_API bool CKF_Version_Gen7_PreUnicode(CKF_File const* file);

// ---- looking at raw files

// One chunk as it stands in the bytes. The outer form is the first, at depth 0.
struct CKF_RawChunk {
    int id;
    int listType;               // of a list and of the outer form; else 0
    std::uint64_t offset;       // of its header
    std::uint32_t claimedSize;  // as its header says, without the list type
    int depth;
    std::span<unsigned char const> data;  // what is really there, behind the list type; never beyond the parent
    char const* problem;                  // null, or what is wrong with it; valid for ever
};

// Goes through all chunks of some bytes, parents first, however broken they are; opens no file and allocates nothing.
// Whatever doesn't fit is given with a problem and cut to its parent, and the walk goes on behind that parent.
class KFS_SERVICE_API CKF_ChunkWalk {
public:
    explicit CKF_ChunkWalk(std::span<unsigned char const> bytes) noexcept;
    // The next chunk; false at the end.
    bool Next(CKF_RawChunk* chunk) noexcept;
    // Whether all chunks so far were without a problem.
    bool Sound() const noexcept { return sound_; }

private:
    std::span<unsigned char const> bytes_;
    std::uint64_t position_ = 0;
    std::uint64_t ends_[CKF_MaxDepth + 1];
    int open_ = 0;
    bool sound_ = true;
};
