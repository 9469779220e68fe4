#pragma once

#include "frame/export.h"
#include "frame/services/strings.h"
#include "frame/services/threads.h"

#include <boost/any.hpp>

#include <atomic>
#include <set>

// Bits of KFS_ExprInfo's flag word; the other bits are the host's.
enum KFS_ExprFlag : unsigned int {
    KFS_ExprFlag_Disabled = 0x1,  // the author switched the expression off
};

// The expression attached to a leaf: its text, its last error, its flags, what the host's engine keeps with it, and
// what it was seen to depend on. The library doesn't parse or run it.
//
// Most leaves have none, and such a record is one null pointer; the first thing that is stored allocates, and may throw
// std::bad_alloc.
//
// Threads: edits belong to the main thread. Dependencies may be added and read on any thread. A render on a temporary
// clone context has an expression cache of its own, in its KFS_StreamCacheState.
class KFS_API KFS_ExprInfo {
public:
    KFS_ExprInfo() = default;
    // The cache's content is cloned: that which GetExpressionCacheImpl finds on the calling thread.
    KFS_ExprInfo(KFS_ExprInfo const& source);
    KFS_ExprInfo& operator=(KFS_ExprInfo const& source);
    ~KFS_ExprInfo();

    u16str const& GetExpression() const { return Fields().expression; }
    // Empties the cache and the dependencies. The error and the flags stay.
    void SetExpression(u16str const& text);
    bool HasExpression() const
    {
        Data const* const data = data_.load(std::memory_order_acquire);
        return data && !data->expression.empty();
    }

    // `line` is -1 when there is none.
    void SetExpressionError(u16str const& text, int line, u16str const& shortText);
    u16str const& GetExpressionError() const { return Fields().errorText; }
    int GetExpressionErrorLine() const { return Fields().errorLine; }
    u16str const& GetExpressionErrorShort() const { return Fields().errorShort; }
    bool HasExpressionError() const { return !Fields().errorText.empty(); }

    unsigned int const& GetFlags() const { return Fields().flags; }
    void SetFlags(unsigned int flags);
    void SetFlagMask(unsigned int value, unsigned int mask) { SetFlags((value & mask) | (~mask & GetFlags())); }
    bool GetFlag(unsigned int mask) const { return (GetFlags() & mask) != 0; }

    // What the host's engine keeps with the expression, such as its compiled form: the record's own, or in a temporary
    // clone context that render's. Not part of the stream's value, hence const. Never null; valid until the record or
    // the render's copies end.
    boost::any* GetExpressionCacheImpl() const;
    boost::any const& GetExpressionCache() const { return *GetExpressionCacheImpl(); }
    void SetExpressionCache(boost::any const& cache) const;

    // What the expression has read, in numbers of the host's.
    void AddDependency(int id) const;
    std::set<int> GetDependencyIds() const;

    void clear();
    // Exchanges everything, and allocates nothing outside a temporary clone context.
    void swap(KFS_ExprInfo& other);

private:
    struct Data {
        u16str expression;
        u16str errorText;
        int errorLine = -1;
        u16str errorShort;
        unsigned int flags = 0;
        boost::any cache;
        std::set<int> dependencies;
        hearth::threads::RecursiveMutex lock{nullptr};  // guards the dependencies
    };
    static Data const& Nothing();
    Data const& Fields() const
    {
        Data const* const data = data_.load(std::memory_order_acquire);
        return data ? *data : Nothing();
    }
    Data& FieldsForModify() const;
    void ForgetCompiled();

    mutable std::atomic<Data*> data_{nullptr};
};
