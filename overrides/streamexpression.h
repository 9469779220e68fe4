#pragma once

#include "frame/export.h"
#include "frame/services/strings.h"

class KFS_Stream;

// The expression of a stream. None of these checks the stream's stamp. Edits belong to the main thread, and listeners
// hear of a change of value, also if nothing is different.

// Sets the text, empty for none, and returns the old one. The error is forgotten; keys and flags stay.
KFS_API u16str KFS_SetStreamExpression(KFS_Stream* stream, u16str const& text);
KFS_API u16str KFS_GetStreamExpression(KFS_Stream const* stream);

// Takes the bits of `mask` from `value`. If KFS_ExprFlag_Disabled is among them the error is forgotten, so that
// switching an expression on or off gives it a fresh try. 0, or the code of an exception on the way.
[[nodiscard]] KFS_API int KFS_SetStreamExprFlags(KFS_Stream* stream, unsigned int mask, unsigned int value);
KFS_API unsigned int KFS_GetStreamExprFlags(KFS_Stream const* stream);

// The last error of the expression: the message, the line (-1 for none) and a short form. Nobody is notified; a new
// text forgets it.
KFS_API void KFS_SetStreamExprErrorMessage(KFS_Stream* stream, u16str const& text, int line, u16str const& shortText);
KFS_API u16str KFS_GetStreamExprErrorMessage(KFS_Stream const* stream);
KFS_API int KFS_GetStreamExprErrorLineNum(KFS_Stream const* stream);
KFS_API u16str KFS_GetStreamShortExprErrorMessage(KFS_Stream const* stream);
