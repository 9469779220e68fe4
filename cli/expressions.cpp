#include "cli/expressions.h"

#include "cli/errors.h"
#include "cli/output.h"
#include "frame/services/strings.h"
#include "host/expression.h"
#include "overrides/streamexpression.h"

#include <algorithm>
#include <cstdio>

using kfshost::StreamItem;

namespace {

bool anyFailed = false;

std::string SentenceOf(kfshost::ExpressionError const& error)
{
    return Shown(error.path) + ": its expression has no value: " + Shown(error.text);
}

}  // namespace

void AddNoExpressions(CLI::App& command, Selection& selection)
{
    command.add_flag("--no-expressions", selection.noExpressions,
                     "what the keys say, as if no stream had an expression");
}

bool HasActiveExpression(StreamItem const& item)
{
    return std::ranges::any_of(
        kfshost::MoversOf(*item.stream), [](KFS_Stream const* mover) { return mover->HasActiveExpression(); });
}

bool TellFailedExpressions(Selection const& selection)
{
    auto const errors = kfshost::TakeExpressionErrors();
    for (kfshost::ExpressionError const& error : errors) TellAbout(selection.file, SentenceOf(error));
    kfshost::TellExpressionErrors(errors);
    anyFailed = anyFailed || !errors.empty();
    return !errors.empty();
}

std::optional<FailedExpression> FailureOf(StreamItem const& item)
{
    for (KFS_Stream const* mover : kfshost::MoversOf(*item.stream)) {
        if (!mover->HasExpressionError() || !mover->HasEnabledExpression()) continue;
        return FailedExpression{Q_UTF16ToMBString(KFS_GetStreamExprErrorMessage(mover)),
                                KFS_GetStreamExprErrorLineNum(mover)};
    }
    return std::nullopt;
}

// The streams may be gone, so they aren't told.
int EndWithExpressions(int code)
{
    auto const errors = kfshost::TakeExpressionErrors();
    for (kfshost::ExpressionError const& error : errors) std::fprintf(stderr, "kfs: %s\n", SentenceOf(error).c_str());
    return anyFailed || !errors.empty() ? ExitFailed : code;
}
