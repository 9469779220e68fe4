// What of the expression record is too long for its header.

#include "overrides/expression.h"

void KFS_ExprInfo::SetExpressionError(u16str const& text, int line, u16str const& shortText)
{
    errorText_ = text;
    errorLine_ = line;
    errorShort_ = shortText;
}
