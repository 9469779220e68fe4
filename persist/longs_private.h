#pragma once

struct CKF_File;
struct CKF_ChunkInfo;

// A signed number as an atom of four bytes, most significant first. Both throw the chunk service's code.
//
// The next atom of that identifier inside `parent`.
int KFSp_ReadLong(CKF_File* file, CKF_ChunkInfo const* parent, int id);
void KFSp_WriteLong(CKF_File* file, int id, int value);
