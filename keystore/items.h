#pragma once

#include "frame/export.h"
#include "keystore/keytypes.h"

class KFS_Stream;

// The bridge between the doubles that records hold and the values that callers see.

// Bytes of a record's value data behind its head: `itemSize` of a custom description, else three doubles a dimension on
// a spatial stream and five on any other. Pure function.
KFS_API int KFS_GetKeyScalarDataSize(KFS_ValueDesc const* desc, unsigned char spatial, short dimension);

// Writes `count` doubles as elements of the data type `dataType` (KFS_Type).
//
// Integers are rounded to the nearest and 16.16 numbers to the nearest 1/65536, halves away from zero; nothing is
// clamped: of a number that is out of range the low bits are stored. `destination` needs no alignment and may be
// `source`. A type without a meaning writes nothing. Always 0. Pure function.
[[nodiscard]] KFS_API int KFS_ConvertItemFromFloat(short count, char dataType, double const* source, void* destination);

// Frees the arc-length tables of all keys and marks every arc as stale, so that the next read measures them again. A
// stream that isn't spatial, or has no key, is left alone.
//
// Operation 89. Result: 0; 2 for a damaged stream; the list service's first code, and then nothing is marked.
// Threads: an edit.
[[nodiscard]] KFS_API int KFS_DisposeRemapTables(KFS_Stream* stream);
