#pragma once

#include "frame/export.h"
#include "frame/services/strings.h"

// Bits of KFS_ExprInfo's flag word; the other bits are the host's.
enum KFS_ExprFlag : unsigned int {
    KFS_ExprFlag_Disabled = 0x1,  // the author switched the expression off
};

// The expression attached to a leaf: its text, its last error and its flags. The library doesn't parse or run it.
// Threads: a plain value without a lock; edits belong to the main thread.
class KFS_API KFS_ExprInfo {
public:
    u16str const& GetExpression() const { return expression_; }
    void SetExpression(u16str const& text) { expression_ = text; }
    bool HasExpression() const { return !expression_.empty(); }

    // `line` is -1 when there is none.
    void SetExpressionError(u16str const& text, int line, u16str const& shortText);
    u16str const& GetExpressionError() const { return errorText_; }
    int GetExpressionErrorLine() const { return errorLine_; }
    u16str const& GetExpressionErrorShort() const { return errorShort_; }
    bool HasExpressionError() const { return !errorText_.empty(); }

    unsigned int const& GetFlags() const { return flags_; }
    void SetFlags(unsigned int flags) { flags_ = flags; }
    void SetFlagMask(unsigned int value, unsigned int mask) { flags_ = (value & mask) | (~mask & flags_); }
    bool GetFlag(unsigned int mask) const { return (flags_ & mask) != 0; }

    void clear() { *this = KFS_ExprInfo(); }

private:
    u16str expression_;
    u16str errorText_;
    int errorLine_ = -1;
    u16str errorShort_;
    unsigned int flags_ = 0;
};
