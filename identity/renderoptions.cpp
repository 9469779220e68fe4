#include "identity/renderoptions.h"

KFS_RenderOptionsBase::~KFS_RenderOptionsBase() = default;

void KFS_RenderOptionsBase::ExtendTimespanToIncludeShutter()
{
    if (GetShutterDuration()->value == 0) return;
    T_Time start{};
    T_Time duration{};
    GetShutterSpan(1, &start, &duration);
    SetTimeSpanStart(&start);
    SetTimeSpanDuration(&duration);
}
