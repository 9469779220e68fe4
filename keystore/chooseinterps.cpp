// What a key inserted at a time ought to take from its neighbours: asked by insertion, and by hosts that preview one.

#include "frame/report_private.h"
#include "keystore/check_private.h"
#include "keystore/edit.h"
#include "keystore/edit_private.h"
#include "keystore/keylist_private.h"
#include "keystore/pins_private.h"
#include "keystore/valuedata_private.h"

namespace {

struct Proposal {
    signed char in = KFS_Interp_None;
    signed char out = KFS_Interp_None;
    unsigned short flags = 0;
    unsigned int spFlags = 0;
    bool hasSpFlags = false;
};

void TakeFlags(KFS_KeyScalar const* key, Proposal* proposal)
{
    proposal->flags = key->flags;
    proposal->hasSpFlags = KFSp_HasSpatialBlock(key);
    proposal->spFlags = proposal->hasSpFlags ? key->spFlags : 0;
}

// The codes of the segment that the new key divides, and what both its keys agree on.
void TakeSegment(KFS_KeyScalar const* a, KFS_KeyScalar const* b, Proposal* proposal)
{
    proposal->in = a->outInterp;
    proposal->out = b->inInterp;
    if ((proposal->in == KFS_Interp_Spline) != (proposal->out == KFS_Interp_Spline)) {
        proposal->in = KFS_Interp_Spline;
        proposal->out = KFS_Interp_Spline;
    }
    TakeFlags(a, proposal);
    proposal->flags &= b->flags;
    if (KFSp_HasSpatialBlock(b)) proposal->spFlags = proposal->hasSpFlags ? proposal->spFlags & b->spFlags : b->spFlags;
    proposal->hasSpFlags = KFSp_HasSpatialBlock(b);
}

int ProposeInList(KFS_StreamKeyData const* data, int time, Proposal* proposal)
{
    bool found = false;
    int index = 0;
    if (int const code = KFSp_SearchKeys(data, time, &found, &index)) return code;
    KFSp_FirstError error;
    {
        KFSp_ScConstPin const pin(data->keys, error);
        int const count = KFSp_ItemCount(data);
        KFS_KeyScalar const* a = nullptr;  // the key before the time
        KFS_KeyScalar const* b = nullptr;  // the key at the time, or after it
        if (error.None() && index > 0 && !found) error.Keep(KFSp_GetConstKey(data, index - 1, &a));
        if (error.None() && index < count) error.Keep(KFSp_GetConstKey(data, index, &b));
        if (!error.None()) {
            // as it is: nothing is proposed
        } else if (a && b) {
            TakeSegment(a, b, proposal);
        } else if (KFS_KeyScalar const* const key = b ? b : a) {
            proposal->in = b ? b->inInterp : a->outInterp;
            proposal->out = found ? b->outInterp : proposal->in;
            TakeFlags(key, proposal);
        }
    }
    return error.Code();
}

int Propose(KFS_Stream const* stream, T_Time const* time, Proposal* proposal)
{
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    stream = data->stream;
    int at = 0;
    if (int const code = KFSp_TimeInStream(stream, time, &at)) return code;
    if (stream->HasNoKeys()) {
        if (!KFSp_CacheIsEmpty(data->cache)) {
            proposal->in = data->cache->inInterp;
            proposal->out = data->cache->outInterp;
        }
        return 0;
    }
    return KFSp_ItemCount(data) > 0 ? ProposeInList(data, at, proposal) : 0;
}

}  // namespace

int KFSp_CanDoInterp(KFS_Stream const* stream, char code)
{
    auto const interp = static_cast<signed char>(code);
    unsigned int const mask = stream->GetInterpMask();
    bool const allowed = interp == KFS_Interp_None || (interp < 0 ? (mask & KFS_InterpMask_Negative) != 0
                                                                  : interp <= 16 && (mask >> (interp - 1) & 1U) != 0);
    return allowed ? 0 : KFSp_ReportErr(KFSp_Op_CanDoInterp, KFS_Err_InterpNotAllowed, interp);
}

int KFSp_ChooseInterpsAndFlags(KFS_Stream* stream, T_Time const* time, char* inInterp, char* outInterp,
                               unsigned short* flags, unsigned int* spFlags)
{
    Proposal proposal;
    KFSp_FirstError error;
    error.Keep(KFSp_CheckStream(KFSp_Op_ChooseInterps, stream, KFSp_Row_InquireKey));
    if (error.None()) error.Keep(KFSp_Boundary([&] { return Propose(stream, time, &proposal); }));
    if (!error.None()) proposal = {};
    if (inInterp) *inInterp = static_cast<char>(proposal.in);
    if (outInterp) {
        // Nothing can follow a hold but a hold, or the value would jump back.
        *outInterp = static_cast<char>(proposal.in == KFS_Interp_Hold ? proposal.in : proposal.out);
    }
    if (flags) *flags = proposal.flags;
    if (spFlags && proposal.hasSpFlags) *spFlags = proposal.spFlags;
    return error.Code();
}

int KFS_ChooseInterps(KFS_Stream* stream, T_Time const* time, char* inInterp, char* outInterp)
{
    return KFSp_ChooseInterpsAndFlags(stream, time, inInterp, outInterp, nullptr, nullptr);
}
