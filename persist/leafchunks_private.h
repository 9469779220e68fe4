#pragma once

#include "frame/services/chunkfile.h"
#include "keystore/items.h"
#include "keystore/stream.h"
#include "tree/paramdef.h"

// What a leaf's writer and its reader have to agree on:
//
//   LIST kfbs
//     kfsb, kfsn         what every node has
//     kfb4               the record
//     cdat               the value, of a stream without keys
//     seql               the keys, if there is a key list: a constant may own one too
//     expr or Utf8       the expression's text, if there is one
//     kfpi kfps, kfum kfuM, or kfli   of some kinds of parameter

inline constexpr int KFSp_LeafListType = CKF_Id("kfbs");
inline constexpr int KFSp_RecordId = CKF_Id("kfb4");
inline constexpr int KFSp_ValueId = CKF_Id("cdat");
inline constexpr int KFSp_OldExpressionId = CKF_Id("expr");
inline constexpr int KFSp_LayerId = CKF_Id("kfpi");
inline constexpr int KFSp_LayerSelectorId = CKF_Id("kfps");
inline constexpr int KFSp_SliderMinId = CKF_Id("kfum");
inline constexpr int KFSp_SliderMaxId = CKF_Id("kfuM");
inline constexpr int KFSp_PathId = CKF_Id("kfli");

// Kinds of parameter with a range for a slider, which is a user's choice and so in the file.
constexpr bool KFSp_HasSliderRange(int paramType)
{
    return paramType == FX_Param_INT_SLIDER || paramType == FX_Param_FIXED_SLIDER || paramType == FX_Param_FLOAT_SLIDER;
}

// Bytes of one value with its tangents, in "cdat" and in a key's record.
inline int KFSp_ValueDataSize(KFS_Stream const* stream)
{
    return KFS_GetKeyScalarDataSize(stream->GetValueDesc(), stream->IsSpatial(), stream->GetDimension());
}
