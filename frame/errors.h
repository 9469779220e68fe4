#pragma once

// The error codes of this library. Exported functions return 0 for success or one of these; class operations throw them
// as an `int`. The codes share their space with the ids of reports: 7425 is 0x1D01. Codes of the services (item lists,
// times, curve kernel, chunk files) pass through unchanged.
enum KFS_Err : int {
    KFS_Err_None = 0,
    KFS_Err_DamagedStream = 2,   // the stream's validity stamp is wrong; nothing else of it was read
    KFS_Err_LegacyMismatch = 3,  // a missing result pointer, mismatched key data, or a broken invariant of the tree
    KFS_Err_OutOfMemory = 4,
    KFS_Err_KeyValue = 7425,  // a key already stands at that time and the caller didn't ask to replace it
    KFS_Err_Constant = 7426,  // the stream holds one value and the operation needs keys
    KFS_Err_NoKeys = 7427,    // the stream has no value or no key at all
    KFS_Err_TimeScale = 7428,
    KFS_Err_TimeOverflow = 7429,
    KFS_Err_TimeNotRepresentable = 7430,
    KFS_Err_InterpNotAllowed =
        7431,  // an interpolation code that the stream's mask refuses, or one that has no meaning
    KFS_Err_BadFileInfo = 7432,
    KFS_Err_BadValueDesc = 7433,  // data type above 9; never reported
    KFS_Err_NotSpatial = 7434,
    KFS_Err_NoControlPoint = 7439,
    KFS_Err_ArcLength2D = 7440,
    KFS_Err_CustomValue = 7441,  // floating-point conversion asked of a custom value
    KFS_Err_TimeOutsideKeys = 7442,
    KFS_Err_Only2D3D = 7443,
    KFS_Err_ExprNoValue = 7444,  // an expression gave no value; reads fall back to the keys
    KFS_Err_CustomNotAllowed = 7445,
    KFS_Err_UnknownStream = 7446,
};
