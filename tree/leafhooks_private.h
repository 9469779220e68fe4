#pragma once

class KFS_Stream;

// What the tree asks of a leaf, whose class it doesn't know: keystore/leafhooks.cpp answers. They throw the code of
// what fails.

// Gives a leaf its default value, at time 0.
void KFSp_InsertDefaultKey(KFS_Stream* leaf);
// The same again, for a leaf that has just found its place and whose default depends on it.
void KFSp_ResetAfterStored(KFS_Stream* leaf);
// From a constant to one key that has its value.
void KFSp_GiveKey(KFS_Stream* leaf);
// Of a prototype's clone: scale and constancy as asked for.
void KFSp_SetUpClone(KFS_Stream* leaf, unsigned int timeScale, bool constant);
void KFSp_Rescale(KFS_Stream* leaf, unsigned int timeScale);
