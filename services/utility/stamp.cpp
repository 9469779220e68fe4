// The mark by which libkfs knows the services that it was built for.
#include "services/stamp_private.h"

unsigned const Qp_ServicesStamp = Qp_ServicesStampValue;
