#pragma once

#include "keystore/lookup.h"

// What a walk over keys carries from key to key.
struct KFSp_KeyWalk {
    KFS_Stream* stream;
    long refcon;
    KFS_KeyFunc func;
    int lastTime = KFS_INVALID_INDEX;  // of the last key handed out
};

// For SEQ_ForRange, with the address of a KFSp_KeyWalk as the word: hands one key to the walk's function, whose result
// it answers.
[[nodiscard]] int KFSp_InvokeItemFunc(SEQ_Head** list, long walk, int index, void* item);
