#pragma once

#include "frame/export.h"
#include "tree/matchname.h"

struct CKF_File;
struct CKF_ChunkInfo;

// Names one child of one group: by its position, by its match name, or by both.
class KFS_API KFS_StreamID {
public:
    static constexpr unsigned int NoIndex = 0xFFFFFFFF;

    KFS_StreamID() = default;
    KFS_StreamID(unsigned int index) : index_(index) {}
    KFS_StreamID(KFS_MatchName const& name) : matchName_(name) {}
    KFS_StreamID(unsigned int index, KFS_MatchName const& name) : index_(index), matchName_(name) {}

    unsigned int GetIndex() const { return index_; }
    KFS_MatchName const& GetMatchName() const { return matchName_; }

    // A list "kfsi". Both throw the chunk service's code; a failed Read leaves the identifier as it was. Write needs a
    // name whose text the pool knows.
    void Read(CKF_File* file, CKF_ChunkInfo const* parent);
    void Write(CKF_File* file) const;

    // By index where both have one, whatever their names; else by name where both names are set. Identifiers without
    // such a common field are unequal, an empty one even to itself: these aren't an equivalence, and identifiers are no
    // keys of a map or a set.
    friend bool operator==(KFS_StreamID const& a, KFS_StreamID const& b)
    {
        return a.index_ != NoIndex && b.index_ != NoIndex ? a.index_ == b.index_
                                                          : a.NamesCanDecide(b) && a.matchName_ == b.matchName_;
    }
    friend bool operator!=(KFS_StreamID const& a, KFS_StreamID const& b) { return !(a == b); }
    friend bool operator<(KFS_StreamID const& a, KFS_StreamID const& b)
    {
        return a.index_ != NoIndex && b.index_ != NoIndex ? a.index_ < b.index_
                                                          : a.NamesCanDecide(b) && a.matchName_ < b.matchName_;
    }

private:
    bool NamesCanDecide(KFS_StreamID const& other) const { return matchName_.IsValid() && other.matchName_.IsValid(); }

    unsigned int index_ = NoIndex;
    KFS_MatchName matchName_;
};
