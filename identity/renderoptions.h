#pragma once

#include "frame/export.h"
#include "frame/services/identifiers.h"
#include "frame/services/time.h"

class KFS_ParamBag;
class KFS_StreamBase;

// What a render asks for: the host derives from it. KFS_StreamBase::GetRenderGuid answers for the span, with the bag.
// The order of the virtual operations is part of the binary interface. They may throw.
// Threads: one render's options serve that render.
class KFS_API KFS_RenderOptionsBase {
public:
    virtual ~KFS_RenderOptionsBase();
    // The span is half open. The pointers are the options' own and valid until the next change.
    virtual T_Time const* GetTimeSpanStart() const = 0;
    virtual void SetTimeSpanStart(T_Time const* start) = 0;
    virtual T_Time const* GetTimeSpanDuration() const = 0;
    virtual void SetTimeSpanDuration(T_Time const* duration) = 0;
    // Of 0 units where there is no motion blur.
    virtual T_Time const* GetShutterDuration() const = 0;
    // While the shutter is open for the span. The library passes 1.
    virtual void GetShutterSpan(int flags, T_Time* start, T_Time* duration) const = 0;
    // Never null.
    virtual KFS_ParamBag const* GetParamBag() const = 0;

    // Makes the span that of the shutter, if there is one. To be called before an identity is asked for.
    void ExtendTimespanToIncludeShutter();
};

// Prunes and watches the walk of GetRenderGuid through a tree; the host derives from it.
// The order of the virtual operations is part of the binary interface.
class GetRenderGuidFilter {
public:
    virtual ~GetRenderGuidFilter() = default;
    // False leaves the child of a group out.
    virtual bool IncludeStream(KFS_StreamBase const* stream) = 0;
    // A child's identity, before it becomes part of its parent's.
    virtual void StreamGuidComputed(KFS_StreamBase const* stream, hearth::utility::Guid const* guid) = 0;
};
