// Text in chunks: UTF-8 that can hold surrogates without a partner, so that any sequence of units comes back.
#pragma once

#include "services/chunkfile/layout_private.h"

#include <string>

std::string CKFp_ToUtf8(u16str const& text);
// What is ill-formed, surrogates apart, becomes U+FFFD.
u16str CKFp_FromUtf8(CKFp_Bytes bytes);

// At most `maxLength` units, and no half of a surrogate pair at the end; 0 is no limit.
u16str CKFp_CutText(u16str text, unsigned long maxLength);
