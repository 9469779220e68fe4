#pragma once

// Where this header stood before it moved to the leaves. Only installed, for hosts that know it by this name.

#include "keystore/paramstreams.h"
