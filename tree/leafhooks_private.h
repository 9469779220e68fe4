#pragma once

class KFS_Stream;
class KFS_StreamBase;
class KFS_StreamFactory;

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

// A leaf as the node that it is.
KFS_StreamBase const* KFSp_AsNode(KFS_Stream const* leaf);

// Separated dimensions: whether a leaf is a leader, how many followers it has, and a follower to be registered, the
// caller's.
bool KFSp_IsSeparationLeader(KFS_Stream const* leaf);
int KFSp_CountFollowers(KFS_Stream const* leader);
KFS_StreamBase* KFSp_MakeFollower(KFS_Stream const* leader, int dimension, KFS_StreamFactory* factory);
