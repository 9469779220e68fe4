// The exchange of two leaves, which has to name every field.

#include "frame/boundary_private.h"
#include "keystore/stream.h"
#include "tree/listener_private.h"

#include <utility>

void KFS_Stream::swap(KFS_Stream& other)
{
    unsigned int const oldFlags = GetStreamBaseFlags();

    SwapBase(other);
    if (stamp_ != other.stamp_)
        std::swap(stamp_, other.stamp_);  // which renders read meanwhile, and isn't written then
    std::swap(dimension_, other.dimension_);
    std::swap(kfsFlags_, other.kfsFlags_);
    std::swap(spInterp_, other.spInterp_);
    std::swap(spInterpMask_, other.spInterpMask_);
    // interpMask_ stays: which temporal interpolations are permitted belongs to a stream's place.
    std::swap(timeScale_, other.timeScale_);
    std::swap(accuracy_, other.accuracy_);
    std::swap(multiplier_, other.multiplier_);
    std::swap(valueDesc_, other.valueDesc_);
    std::swap(interpFunc_, other.interpFunc_);
    std::swap(copyItemFunc_, other.copyItemFunc_);
    std::swap(disposeItemFunc_, other.disposeItemFunc_);
    // The streams' own key data, whatever context the thread is in.
    std::swap(keyData_.keys, other.keyData_.keys);
    std::swap(keyData_.times, other.keyData_.times);
    std::swap(keyData_.invalidKeyIndex, other.keyData_.invalidKeyIndex);
    std::swap(keyData_.arcInvalidKeyIndex, other.keyData_.arcInvalidKeyIndex);
    exprInfo_.swap(other.exprInfo_);
    std::swap(keyData_.cache, other.keyData_.cache);

    ShowChangeInCopy();
    other.ShowChangeInCopy();
    // A list hands its owner to the item functions.
    KFSp_FirstError error;
    for (KFS_Stream* const owner : {this, &other})
        if (owner->keyData_.keys) error.Keep(SEQ_SetRefcon(owner, owner->keyData_.keys));
    KFSp_ThrowIf(error.Code());

    NotifyValueChanged();
    unsigned int const newFlags = GetStreamBaseFlags();
    if (newFlags != oldFlags) {
        KFSp_Notify(
            this, [this, oldFlags,
                   newFlags](KFS_StreamListener* listener) { listener->StreamFlagsChanged(this, oldFlags, newFlags); });
    }
}
