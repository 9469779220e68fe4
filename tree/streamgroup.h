#pragma once

#include "tree/streambase.h"

class KFS_ParamBag;
struct T_Time;

// An interior node of a stream tree. A root is a group without a parent; hosts derive their root from this class.
class KFS_API KFS_StreamGroup : public KFS_StreamBase {
public:
    bool IsGroup() const override;
    KFS_StreamGroup* GetAsGroup() override;
    KFS_StreamGroup const* GetAsGroup() const override;

    virtual unsigned int GetNumStreams() const = 0;
    virtual KFS_StreamBase const* GetStream(unsigned int index) const = 0;
    // The child at `index`, or null while it is a canonical instance: never upgrades it.
    virtual KFS_StreamBase* GetEditableStreamNullOK(unsigned int index) = 0;
    // Told, from the parent up, that `stream` now stands in `group`.
    virtual void NotifyStreamStored(KFS_StreamGroup* group, KFS_StreamBase* stream);
    // Time units a second of the leaves below: the parent's answer, or 600 without a parent.
    virtual unsigned int GetPreferredTimeScale() const;
    // Runs a leaf's expression at the root. 1 means that there is no value, which is the answer here; the host's root overrides it.
    virtual int EvaluateExpression(KFS_Stream const* stream, T_Time const* time, double* values, void** customValue,
                                   KFS_ParamBag const* bag);

    // Calls NotifyStreamStored on `group` and on each of its ancestors, once: a call from inside such a notification does nothing.
    static void NotifyParentsStreamStored(KFS_StreamGroup* group, KFS_StreamBase* stream);

protected:
    KFS_StreamGroup(KFS_MatchName const* name, KFS_StreamFactory* factory, bool canonical);
    KFS_StreamGroup(KFS_StreamGroup const& source);
};
