#pragma once

#include "frame/services/memory.h"
#include "services/chunkfile/failure_private.h"
#include "services/chunkfile/layout_private.h"

#include <array>

// A file that is open for reading: its bytes, the chunks entered, and one position. Every failure is recorded.
class CKFp_Reader : public Q_MemTrackedObject {
public:
    CKFp_Reader(CKFp_Bytes bytes, CKFp_Failure& failure) noexcept : bytes_(bytes), failure_(failure) {}

    // Checks the outer form and takes the version record; the position is then behind it.
    [[nodiscard]] int Start(CKFp_Version* version) noexcept;

    // Looks for the next chunk inside the innermost open list; 0 stands for any id, any list type. The position doesn't
    // move. CKF_Err_NoSuchChunk isn't recorded.
    [[nodiscard]] int Find(int id, int listType, CKF_ChunkInfo const* parent, CKFp_Chunk* found) noexcept;
    // The data of a chunk that was found; the position goes behind it.
    CKFp_Bytes Take(CKFp_Chunk const& chunk) noexcept;

    [[nodiscard]] int Enter(CKFp_Chunk const& chunk, CKF_ChunkInfo* info) noexcept;
    // Leaves that chunk, and what was entered inside it. Nothing happens where it isn't open any more.
    void Leave(CKF_ChunkInfo const& info) noexcept;
    // The next bytes of the atom that was entered last.
    [[nodiscard]] int Read(std::size_t size, void* buffer) noexcept;

    CKFp_Bytes Bytes() const noexcept { return bytes_; }
    std::uint64_t Position() const noexcept { return position_; }

private:
    // A search that found nothing from here on.
    struct Missing {
        int id, listType;
    };
    struct Level {
        CKFp_Chunk chunk;
        std::array<Missing, 4> missing;  // filled in a ring
        unsigned missingCount = 0;

        bool IsKnownMissing(int id, int listType) const noexcept;
        void RememberMissing(int id, int listType) noexcept;
    };

    Level& Top() noexcept { return levels_[static_cast<std::size_t>(open_)]; }
    bool IsTop(CKF_ChunkInfo const& info) noexcept;
    [[nodiscard]] int CheckLevel(CKF_ChunkInfo const* parent) noexcept;

    CKFp_Bytes bytes_;
    CKFp_Failure& failure_;
    std::uint64_t position_ = 0;
    int open_ = 0;                                // chunks entered; level 0 is the form
    std::array<Level, CKF_MaxDepth + 2> levels_;  // and one for an atom in the deepest list
};
