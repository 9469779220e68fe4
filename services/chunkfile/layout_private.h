// How chunks lie in a file.
#pragma once

#include "frame/services/chunkfile.h"

#include <cstddef>
#include <cstdint>
#include <span>

// The whole file is one chunk with the form's id and a type; the first chunk inside it is the version record.
inline constexpr int CKFp_FormId = CKF_Id("KFSF");
inline constexpr int CKFp_FormType = CKF_Id("proj");
inline constexpr int CKFp_VersionId = CKF_Id("vers");

inline constexpr std::size_t CKFp_HeaderSize = 8;       // id, length
inline constexpr std::size_t CKFp_ListHeaderSize = 12;  // and list type, which the length counts
inline constexpr std::size_t CKFp_VersionSize = 12;     // what CKFp_Version holds
inline constexpr std::size_t CKFp_LengthOffset = 4;     // of the length in a header
inline constexpr std::size_t CKFp_VersionOffset = CKFp_ListHeaderSize + CKFp_HeaderSize;
inline constexpr std::size_t CKFp_PreludeSize = CKFp_VersionOffset + CKFp_VersionSize;

using CKFp_Bytes = std::span<unsigned char const>;

inline std::uint32_t CKFp_Get32(unsigned char const* bytes) noexcept
{
    return (std::uint32_t{bytes[0]} << 24) | (std::uint32_t{bytes[1]} << 16) | (std::uint32_t{bytes[2]} << 8) |
           bytes[3];
}

inline void CKFp_Put32(unsigned char* bytes, std::uint32_t value) noexcept
{
    for (int i = 0; i < 4; ++i) bytes[i] = static_cast<unsigned char>(value >> (24 - 8 * i));
}

inline void CKFp_PutHeader(unsigned char* header, int id, std::uint32_t length) noexcept
{
    CKFp_Put32(header, static_cast<std::uint32_t>(id));
    CKFp_Put32(header + CKFp_LengthOffset, length);
}

// What the version record holds, in its order.
struct CKFp_Version {
    std::int32_t major = 0;
    std::int32_t minor = 0;
    std::int32_t encoding = 0;
};

CKFp_Version CKFp_GetVersion(unsigned char const* record) noexcept;
void CKFp_PutVersion(unsigned char* record, CKFp_Version const& version) noexcept;

constexpr bool CKFp_IsAtomId(int id) noexcept
{
    return id != 0 && id != CKF_ListId && id != CKFp_FormId;
}

// One chunk inside the limits of its parent.
struct CKFp_Chunk {
    int id = 0;
    int listType = 0;
    std::uint32_t claimed = 0;  // length as the header says, without the list type
    std::uint64_t offset = 0;   // of the header
    std::uint64_t data = 0;     // behind header and list type
    std::uint64_t end = 0;      // behind the data
    std::uint64_t next = 0;     // behind the padding

    bool IsList() const noexcept { return id == CKF_ListId || id == CKFp_FormId; }
    std::uint32_t Size() const noexcept { return static_cast<std::uint32_t>(end - data); }
};

// Takes the chunk at an offset; `limit`, above the offset and inside the bytes, is where its parent ends. Null, or what
// is wrong with the chunk; all offsets then lie inside the limit all the same.
char const* CKFp_ParseChunk(CKFp_Bytes bytes, std::uint64_t offset, std::uint64_t limit, CKFp_Chunk* chunk) noexcept;
