#pragma once

#include "frame/services/context.h"

// What Q_RenderContext::PeekCurrent answers, for libkfs, where a call is a good part of a short read.
extern KFS_SERVICE_API constinit thread_local Q_RenderContext* Qp_currentRenderContext;
