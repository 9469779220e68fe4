#pragma once

#include "frame/services/export.h"

// What libkfs may reach into without asking, as a number: it grows whenever the head of a list or the solve changes.
inline constexpr unsigned Qp_ServicesStampValue = 1;

// The number of the services that were loaded. Services of another make have no such symbol.
extern "C" KFS_SERVICE_API unsigned const Qp_ServicesStamp;
