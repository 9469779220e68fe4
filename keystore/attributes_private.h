#pragma once

class KFS_Stream;

// Whether a spatial interpolation setting is allowed: 0 always, another if bit (code - 1) of the *temporal*
// interpolation mask is set. The spatial mask has no say. KFS_Err_InterpNotAllowed, reported under operation 15,
// otherwise.
[[nodiscard]] int KFSp_CanDoSpInterp(KFS_Stream* stream, unsigned short code);
