#pragma once

#include "keystore/edit.h"
#include "keystore/stream.h"

#include <span>

// The short ways of edits on plain streams, whose keys are bytes that nobody owns: what the general way leaves behind,
// written down at once. Each answers whether it has done the whole edit but for telling listeners; where it hasn't,
// nothing has changed and the general way is to be gone. None of them reports, nor fails.

// KFS_InsertKey behind the last key, with a value in doubles and both codes given.
[[nodiscard]] bool KFSp_AppendPlainKey(KFS_Stream* stream, T_Time const* time, double const* value, char inInterp,
                                       char outInterp);
// KFS_RemoveKey of the last of several keys.
[[nodiscard]] bool KFSp_RemoveLastPlainKey(KFS_Stream* stream, int index);
// KFS_InsertKeys where no time is given twice and no key stands at any of them, and where no handle follows from the
// order in which keys come.
[[nodiscard]] bool KFSp_InsertPlainKeys(KFS_Stream* stream, KFS_NewKeys const& keys);
