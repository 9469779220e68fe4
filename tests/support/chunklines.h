#pragma once

#include "frame/services/chunkfile.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <functional>
#include <string>
#include <vector>

// A file in memory, for writing and then for reading.
class MemoryFile {
public:
    // What `write` puts into a new file. Fails the test if the file isn't whole.
    explicit MemoryFile(std::function<void(CKF_File*)> const& write)
    {
        EXPECT_EQ(0, file_.CreateInMemory());
        write(&file_);
        EXPECT_EQ(0, file_.Commit()) << file_.LastErrorText();
        bytes_.assign(file_.GetBytes().begin(), file_.GetBytes().end());
    }

    std::vector<unsigned char> const& Bytes() const { return bytes_; }

    // One line a chunk, below the outer form and its version record: depth by blanks, the id, and a list's type or an
    // atom's bytes in hexadecimal.
    std::vector<std::string> Lines() const { return LinesOf(bytes_); }
    static std::vector<std::string> LinesOf(std::span<unsigned char const> bytes)
    {
        std::vector<std::string> lines;
        CKF_ChunkWalk walk(bytes);
        CKF_RawChunk chunk;
        for (int i = 0; walk.Next(&chunk); ++i) {
            EXPECT_EQ(nullptr, chunk.problem);
            if (i < 2) continue;
            std::string line(static_cast<std::size_t>(2 * (chunk.depth - 1)), ' ');
            line += Letters(chunk.id) + ' ' + (chunk.id == CKF_ListId ? Letters(chunk.listType) : Hex(chunk.data));
            lines.push_back(line);
        }
        return lines;
    }

    // A file that begins anew each time.
    void Read(std::function<void(CKF_File*)> const& read) const
    {
        CKF_File file;
        ASSERT_EQ(0, file.Open(bytes_)) << file.LastErrorText();
        read(&file);
    }

    static std::string Hex(std::span<unsigned char const> bytes)
    {
        std::string text;
        for (unsigned char const byte : bytes) {
            text += "0123456789abcdef"[byte >> 4];
            text += "0123456789abcdef"[byte & 15];
        }
        return text;
    }

private:
    static std::string Letters(int id)
    {
        std::string text;
        for (int shift = 24; shift >= 0; shift -= 8) text += static_cast<char>(id >> shift);
        return text;
    }

    CKF_File file_;
    std::vector<unsigned char> bytes_;
};

// Makes the n-th piece of data that goes into a file fail.
class FailNthAppend : public CKF_IoHook {
public:
    explicit FailNthAppend(int n) : left_(n) {}
    int Before(CKF_IoCall call, std::size_t) noexcept override
    {
        if (call != CKF_IoCall::Append || --left_ != 0) return 0;
        fired_ = true;
        return 28;  // no space left on device
    }
    bool Fired() const { return fired_; }

private:
    int left_;
    bool fired_ = false;
};
