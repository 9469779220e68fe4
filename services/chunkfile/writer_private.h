#pragma once

#include "services/chunkfile/layout_private.h"
#include "services/chunkfile/sink_private.h"

#include <array>
#include <memory>
#include <utility>

// A file that is being written: a sink and the lists that are open. Every failure is recorded.
class CKFp_Writer : public Q_MemTrackedObject {
public:
    CKFp_Writer(std::unique_ptr<CKFp_Sink> sink, std::uint32_t maxSize, CKFp_Failure& failure) noexcept
        : sink_(std::move(sink)),
          maxSize_(maxSize),
          failure_(failure)
    {}

    // The outer form and an empty version record.
    [[nodiscard]] int Start();
    // Length of the form, version record, and the sink's commit.
    [[nodiscard]] int Commit(CKFp_Version const& version);

    // An atom whose data comes in pieces: begin, pieces of `size` bytes together, end.
    [[nodiscard]] int BeginAtom(int id, std::uint64_t size);
    [[nodiscard]] int Append(void const* bytes, std::size_t size) { return size == 0 ? 0 : sink_->Append(bytes, size); }
    [[nodiscard]] int EndAtom(std::uint64_t size);
    // One that goes to the sink in one piece: a tree has a dozen a leaf.
    static constexpr std::size_t MostBytesOfSmallAtom = 256;
    [[nodiscard]] int WriteSmallAtom(int id, void const* data, std::size_t size);

    [[nodiscard]] int BeginList(int listType, CKF_ChunkInfo* chunk);
    [[nodiscard]] int EndList(CKF_ChunkInfo* chunk);

private:
    [[nodiscard]] int CheckRoom(std::uint64_t size);
    [[nodiscard]] int PatchLength(std::uint64_t data);

    std::unique_ptr<CKFp_Sink> sink_;
    std::uint32_t maxSize_;
    CKFp_Failure& failure_;
    int open_ = 0;
    std::array<std::uint32_t, CKF_MaxDepth> data_{};  // where the data of each open list begins
};
