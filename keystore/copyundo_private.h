#pragma once

#include "keystore/savedrecords_private.h"
#include "keystore/stream.h"

// Takes back the copying of keys into a stream. Before each copy Note() is told where it will stand, and after it Put()
// where it does stand: by index, since a listener's read may give a float key another time, but never another place.
class KFSp_CopyUndo {
public:
    // `count`: how many notes there will be at most.
    KFSp_CopyUndo(KFS_Stream* stream, KFS_StreamKeyData* data, int count) noexcept;
    ~KFSp_CopyUndo();
    KFSp_CopyUndo(KFSp_CopyUndo const&) = delete;
    KFSp_CopyUndo& operator=(KFSp_CopyUndo const&) = delete;

    [[nodiscard]] int Code() const noexcept;
    // Keeps a copy of the key at that time, if there is one.
    [[nodiscard]] int Note(int time);
    // KFS_INVALID_INDEX: the copying failed before anybody heard of the key.
    void Put(int index) noexcept;
    // The keys are what they were, in value and handles; their arcs are to be measured anew.
    void Undo();

private:
    struct Step {
        int time;
        int index;
        bool overwrites;  // the last key of `kept_` stood there
    };

    [[nodiscard]] int Keep(int index);
    void TakeBack(Step const& step);
    void PutBack(int index);

    KFS_Stream* stream_;
    KFS_StreamKeyData* data_;
    SEQ_Head** kept_ = nullptr;
    KFSp_ScBytes steps_;
    int stepCount_ = 0;
};
