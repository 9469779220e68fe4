#pragma once

#include "keystore/edit.h"
#include "keystore/stream.h"

// Puts the key that stands in the cache record into the list: the one way in. On a stream without a list it makes the
// value in the record the stream's own. Notifies.
//
//   overwrite      a key at exactly that time may be replaced
//   valueGiven     the record's value is meant; else the key takes the value that the stream has there
//   tangentsGiven  the record's tangents stand; else they are to be computed
//   clearCache     the record owns its value, which is disposed at the end; else the value is the caller's, and the
//                  record is only marked empty
//   index          out or null: where the key stands; KFS_INVALID_INDEX on failure
//
// Operation 38.
[[nodiscard]] int KFSp_InsertKeyFromCache(unsigned char overwrite, unsigned char valueGiven,
                                          unsigned char tangentsGiven, unsigned char clearCache, KFS_Stream* stream,
                                          int* index);

// The same without the notification, for whoever isn't done yet.
struct KFSp_PutKey {
    bool overwrite = false;
    bool valueGiven = false;
    bool tangentsGiven = false;
    bool clearCache = false;
};
[[nodiscard]] int KFSp_PutKeyFromCache(KFS_Stream* stream, KFSp_PutKey const& how, int* index);

// KFS_InsertKeyF on a stream that is known to be whole, without the notification.
[[nodiscard]] int KFSp_InsertKeyF(KFS_Stream* stream, T_Time const* time, bool replace, double const* value,
                                  char inInterp, char outInterp);

// Takes a key out of the list, into the cache record with `keepInCache`. This is KFS_Stream::RemoveKey without the
// notification.
[[nodiscard]] int KFSp_TakeKeyOut(KFS_Stream* stream, int index, bool keepInCache);

// KFS_ChooseInterps, with the key flags and the spatial flags that the new key ought to take. `spFlags` is left alone
// where no key with a spatial block was looked at.
[[nodiscard]] int KFSp_ChooseInterpsAndFlags(KFS_Stream* stream, T_Time const* time, char* inInterp, char* outInterp,
                                             unsigned short* flags, unsigned int* spFlags);

// 0 if the stream's mask permits the code; else reports KFS_Err_InterpNotAllowed with operation 13 and answers it.
[[nodiscard]] int KFSp_CanDoInterp(KFS_Stream const* stream, char code);

// For SEQ_ForEach on a key list: makes each key's KFS_KeyFlag_SpatialBlock say `on`.
[[nodiscard]] int KFSp_SetKeySpatialState(SEQ_Head** list, long on, int index, void* key);
// For SEQ_ForEach on a key list: makes each key forget its arc table, without disposing it.
[[nodiscard]] int KFSp_KeyClearRemap(SEQ_Head** list, long, int index, void* key);

// Gives a stream the description of plain doubles, and a copy function that suits it, for a while: the functions that
// take values in external form then take doubles. The key list calls the copy function too, whoever made the list, and
// is rid of it afterwards. Restore() ends it and answers the code of restoring; the destructor restores too.
class KFSp_ScDoubleValues {
public:
    KFSp_ScDoubleValues(KFS_Stream* stream, KFS_CopyItemFunc copy);
    ~KFSp_ScDoubleValues();
    KFSp_ScDoubleValues(KFSp_ScDoubleValues const&) = delete;
    KFSp_ScDoubleValues& operator=(KFSp_ScDoubleValues const&) = delete;

    // The code of taking on the description.
    [[nodiscard]] int Code() const { return code_; }
    [[nodiscard]] int Restore();

private:
    KFS_Stream* stream_;
    KFS_CopyItemFunc copy_;
    KFS_DisposeItemFunc dispose_;
    KFS_InterpFunc interp_;
    KFS_ValueDesc saved_;
    bool wasNonCustom_;
    int code_;
};
