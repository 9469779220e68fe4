#pragma once

#include "keystore/stream.h"

#include <optional>
#include <string>
#include <string_view>
#include <vector>

// Expressions: texts in Lua that compute a stream's value in place of its keys (docs/expressions.md says what they see). The
// engine belongs to each render context's ExpState (host/session.h) and is made with the first expression that it reads.
//
// A temporary clone context takes the paths of a tree's streams once, when an expression first needs them, which has to be while
// nobody edits the tree. It goes by them as long as it lives, and the streams must live as long.
//
// An expression that fails has no value: the read goes on with the keys, and the failure is kept in the ExpState that read it,
// once a stream. Streams that are told of it (TellExpressionErrors) count as without an expression until their text or
// their flags change.

namespace kfshost {

class SceneGroup;

struct ExpressionError {
    KFS_Stream const* stream = nullptr;
    std::string path;  // as `kfs info` lists it; the display name of a stream outside a scene's tree
    std::string text;  // "line 2: ..."; what KFS_GetStreamExprErrorMessage answers once it is told
    std::string shortText;
    int line = -1;  // from 1; -1 where there is none
};

// Whether a text can be compiled; what is wrong with it where it can't. `stream` and `path` stay empty. Any thread.
std::optional<ExpressionError> CheckExpression(std::string_view text);

// What expressions of a tree need to know of it as a whole: the paths of its streams, and the rate on whose frames their keys
// lie, which is what `frame` counts in. Loading a project and making a tree do this; call it again when names or keys
// have changed since, or when an expression that counts frames is new. Main thread, while no render runs. Throws
// StoreError.
void PrepareExpressions(SceneGroup& tree);

// The stream that an id of KFS_ExprInfo's dependencies stands for, which is its place in the order of the tree as it is now;
// empty for an id that stands for none. Ids hold until streams come or go: then those noted before may name others.
std::string PathOfDependency(SceneGroup const& tree, int id);

// The failures that the current render context's reads have met since this was last asked.
std::vector<ExpressionError> TakeExpressionErrors();

// Lets the streams know: KFS_SetStreamExprErrorMessage for each. Main thread, while the streams live.
void TellExpressionErrors(std::vector<ExpressionError> const& errors);

}  // namespace kfshost
