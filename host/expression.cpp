// What a host asks of expressions from outside a read.

#include "host/expression.h"

#include "frame/services/strings.h"
#include "host/expressionlua_private.h"
#include "host/expressionpaths_private.h"
#include "host/framegrid.h"
#include "host/projectfile.h"
#include "host/session.h"
#include "overrides/streamexpression.h"

namespace kfshost {

std::optional<ExpressionError> CheckExpression(std::string_view text)
{
    LuaState lua(nullptr);
    std::optional<ExpressionFault> fault;
    lua.BeginRead();
    lua.Compile(text, fault);
    if (!fault) return std::nullopt;
    return ExpressionError{nullptr, "", fault->FullText(), fault->text, fault->line};
}

void PrepareExpressions(SceneGroup& tree)
{
    std::vector<StreamItem> items;
    for (ListedStream const& listed : ListStreams(tree)) {
        items.emplace_back();
        items.back().stream = StreamPtr(const_cast<KFS_Stream*>(listed.stream), StreamDeleter(false));
    }
    std::vector<StreamItem const*> pointers;
    for (StreamItem const& item : items) pointers.push_back(&item);
    tree.frameRate = FindFrameGrid(pointers).rate;
    tree.KeepPaths(
        [&tree](std::shared_ptr<StreamPaths const>& kept) { kept = std::make_shared<StreamPaths const>(tree); });
}

std::string PathOfDependency(SceneGroup const& tree, int id)
{
    std::shared_ptr<StreamPaths const> const paths = PathsOf(tree);
    std::string const* const path = paths->PathOf(id);
    return path ? *path : "";
}

std::vector<ExpressionError> TakeExpressionErrors()
{
    Q_RenderContext const* const context = Q_RenderContext::PeekCurrent();
    auto* const state = context ? dynamic_cast<ExpState*>(context->PeekState(ExpState::S_StateName)) : nullptr;
    return state ? state->TakeErrors() : std::vector<ExpressionError>();
}

void TellExpressionErrors(std::vector<ExpressionError> const& errors)
{
    for (ExpressionError const& error : errors) {
        KFS_SetStreamExprErrorMessage(const_cast<KFS_Stream*>(error.stream), Q_MBToUTF16String(error.text), error.line,
                                      Q_MBToUTF16String(error.shortText));
    }
}

}  // namespace kfshost
