// What of parameter bags is too long for their header.

#include "overrides/parambag.h"

KFS_ParamBag::KFS_ParamBag(KFS_ParamBag const& a, KFS_ParamBag const& b) : overrides_(a.overrides_)
{
    overrides_.insert(b.overrides_.begin(), b.overrides_.end());
}

KFS_ParamBag::~KFS_ParamBag() = default;
