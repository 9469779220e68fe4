// The expression record. Its content is allocated with the first thing that isn't as in a new one.

#include "overrides/expression.h"

#include "keystore/cachestate.h"
#include "keystore/renderstates_private.h"
#include "keystore/shortcuts_private.h"

#include <memory>

namespace {

// Where the calling thread's render keeps its caches, or null outside a temporary clone context.
KFS_StreamCacheState* CloneState()
{
    Q_RenderContext const* const context = KFSp_PeekRenderContext();
    return context && context->GetIsTempCloneContext() ? KFSp_GetRenderStates(context).cacheState : nullptr;
}

}  // namespace

// Outlives every record, those in static storage included.
KFS_ExprInfo::Data const& KFS_ExprInfo::Nothing()
{
    static Data const* const nothing = new Data;
    return *nothing;
}

// Dependencies come from render threads, so two may be the first at once.
KFS_ExprInfo::Data& KFS_ExprInfo::FieldsForModify() const
{
    Data* data = data_.load(std::memory_order_acquire);
    if (data) return *data;
    auto made = std::make_unique<Data>();
    return data_.compare_exchange_strong(data, made.get()) ? *made.release() : *data;
}

KFS_ExprInfo::KFS_ExprInfo(KFS_ExprInfo const& source)
{
    *this = source;
}

// What can run out of memory comes first. The block stays, for renders may be adding dependencies to it.
KFS_ExprInfo& KFS_ExprInfo::operator=(KFS_ExprInfo const& source)
{
    if (this == &source) return *this;
    Data const* const from = source.data_.load(std::memory_order_acquire);
    if (!from) {
        clear();
        return *this;
    }
    u16str expression = from->expression;
    u16str errorText = from->errorText;
    u16str errorShort = from->errorShort;
    std::set<int> dependencies = source.GetDependencyIds();
    boost::any cache = source.GetExpressionCache();
    boost::any* const ownCache = GetExpressionCacheImpl();
    Data& data = FieldsForModify();
    data.expression.swap(expression);
    data.errorText.swap(errorText);
    data.errorLine = from->errorLine;
    data.errorShort.swap(errorShort);
    data.flags = from->flags;
    ownCache->swap(cache);
    hearth::threads::ScRecursiveLock const guard(data.lock);
    data.dependencies.swap(dependencies);
    return *this;
}

KFS_ExprInfo::~KFS_ExprInfo()
{
    Data* const data = data_.load(std::memory_order_acquire);
    if (!data) return;
    if (KFS_StreamCacheState* const state = CloneState()) state->ForgetExpressionCache(this);
    delete data;
}

void KFS_ExprInfo::ForgetCompiled()
{
    if (!data_.load(std::memory_order_acquire)) return;
    boost::any nothing;
    GetExpressionCacheImpl()->swap(nothing);
    Data& data = FieldsForModify();
    hearth::threads::ScRecursiveLock const guard(data.lock);
    data.dependencies.clear();
}

void KFS_ExprInfo::SetExpression(u16str const& text)
{
    if (text != GetExpression()) FieldsForModify().expression = text;
    ForgetCompiled();
}

void KFS_ExprInfo::SetExpressionError(u16str const& text, int line, u16str const& shortText)
{
    if (text == GetExpressionError() && line == GetExpressionErrorLine() && shortText == GetExpressionErrorShort())
        return;
    u16str newText = text;
    u16str newShortText = shortText;
    Data& data = FieldsForModify();
    data.errorText.swap(newText);
    data.errorLine = line;
    data.errorShort.swap(newShortText);
}

void KFS_ExprInfo::SetFlags(unsigned int flags)
{
    if (flags != GetFlags()) FieldsForModify().flags = flags;
}

boost::any* KFS_ExprInfo::GetExpressionCacheImpl() const
{
    Data* data = data_.load(std::memory_order_acquire);
    if (!data)
        data = &FieldsForModify();  // also where the cache is the render's: the end of the record drops that one then
    KFS_StreamCacheState* const state = CloneState();
    return state ? state->GetOverrideExpressionCache(this) : &data->cache;
}

void KFS_ExprInfo::SetExpressionCache(boost::any const& cache) const
{
    *GetExpressionCacheImpl() = cache;
}

void KFS_ExprInfo::AddDependency(int id) const
{
    Data& data = FieldsForModify();
    hearth::threads::ScRecursiveLock const guard(data.lock);
    data.dependencies.insert(id);
}

std::set<int> KFS_ExprInfo::GetDependencyIds() const
{
    Data* const data = data_.load(std::memory_order_acquire);
    if (!data) return {};
    hearth::threads::ScRecursiveLock const guard(data->lock);
    return data->dependencies;
}

// The lock stays, and with it the block that it lies in.
void KFS_ExprInfo::clear()
{
    ForgetCompiled();
    if (!data_.load(std::memory_order_acquire)) return;
    Data& data = FieldsForModify();
    data.expression.clear();
    data.errorText.clear();
    data.errorLine = -1;
    data.errorShort.clear();
    data.flags = 0;
}

void KFS_ExprInfo::swap(KFS_ExprInfo& other)
{
    if (this == &other) return;
    if (CloneState()) GetExpressionCacheImpl()->swap(*other.GetExpressionCacheImpl());
    Data* const mine = data_.exchange(other.data_.load());
    other.data_.store(mine);
}
