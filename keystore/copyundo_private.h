#pragma once

#include "keystore/savedrecords_private.h"
#include "keystore/stream.h"

// Takes back the copying of keys into a stream. Before each copy Note() is told where it will stand.
class KFSp_CopyUndo {
public:
    // `count`: how many notes there will be at most.
    KFSp_CopyUndo(KFS_Stream* stream, KFS_StreamKeyData* data, int count) noexcept;
    ~KFSp_CopyUndo();
    KFSp_CopyUndo(KFSp_CopyUndo const&) = delete;
    KFSp_CopyUndo& operator=(KFSp_CopyUndo const&) = delete;

    int Code() const noexcept;
    // Keeps a copy of the key at that time, if there is one.
    int Note(int time);
    // The keys are what they were, in value and handles; their arcs are to be measured anew.
    void Undo();

private:
    struct Step {
        int time;
        bool overwrites;  // the last key of `kept_` stood there
    };

    int Keep(int index);
    void PutBack(int index);
    void MarkAllStale() const;

    KFS_Stream* stream_;
    KFS_StreamKeyData* data_;
    SEQ_Head** kept_ = nullptr;
    KFSp_ScBytes steps_;
    int stepCount_ = 0;
};
