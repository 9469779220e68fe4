#pragma once

#include "host/expression.h"
#include "host/expressionlua_private.h"
#include "host/expressionpaths_private.h"
#include "keystore/expstate.h"

#include <boost/container/small_vector.hpp>

#include <array>
#include <memory>
#include <string>
#include <unordered_set>
#include <utility>
#include <vector>

namespace kfshost {

// A stream's expression as a function of the engine that compiled it. The stream's expression cache holds it.
struct CompiledExpression {
    explicit CompiledExpression(std::shared_ptr<LuaState> state) : lua(std::move(state)) {}
    ~CompiledExpression()
    {
        if (function != LUA_NOREF) lua->Release(function);
    }
    CompiledExpression(CompiledExpression const&) = delete;
    CompiledExpression& operator=(CompiledExpression const&) = delete;

    std::shared_ptr<LuaState> lua;
    u16str text;
    int function = LUA_NOREF;
    std::optional<ExpressionFault> fault;  // why there is no function
    bool usesValue = false;                // what it doesn't name isn't worked out
    bool usesFrame = false;
    bool mayTakeLong = false;
    bool isCounted = false;       // instruction by instruction, which slows each of them down
    std::size_t longestText = 0;  // that stands in it, in bytes
    std::set<int> dependencies;   // which the stream knows of
};

// Runs the expressions that one render context reads. Threads: the context's.
class ExpressionEngine {
public:
    using Numbers = boost::container::small_vector<double, 4>;

    explicit ExpressionEngine(KFS_ExpState& state);
    ExpressionEngine(ExpressionEngine const&) = delete;
    ExpressionEngine& operator=(ExpressionEngine const&) = delete;

    // Into as many doubles as the stream has dimensions. Throws an int: KFS_Err_ExprNoValue where there is no value, so
    // that the keys answer; inside an expression another code, so that the one that asked has no value either.
    void Evaluate(KFS_Stream const* stream, int time, int flags, double* values, KFS_ParamBag const* bag);

    std::vector<ExpressionError> TakeErrors();

    // ---- for the functions that expressions call, while one runs

    // What runs.
    struct Run {
        KFS_Stream const* stream;
        KFS_Stream const* seen;  // as this context's reads see it
        int time;                // in its scale
        int flags;
        KFS_ParamBag const* bag;
        CompiledExpression* compiled;

        double Seconds() const { return static_cast<double>(time) / seen->GetTimeScale(); }
        std::size_t Dimension() const { return static_cast<std::size_t>(seen->GetDimension()); }
    };
    Run const& Current() const { return runs_[depth_ - 1]; }

    // The value of another stream at a time, or at the present one, through its expression. What is wrong raises an error.
    void ReadStream(lua_State* lua, std::string_view path, double const* seconds, Numbers& values);
    // What the running expression's keys say at a time of its stream. The same.
    void ReadKeys(lua_State* lua, int time, double* values);

    // A time in seconds as one of a stream, held at the ends of its time line.
    static int UnitsOf(double seconds, KFS_Stream const& seen);

    // A read that goes through more expressions than this is taken for one without an end.
    static constexpr std::size_t MaxDepth = 64;

private:
    class ScRun;

    CompiledExpression& CompiledFor(KFS_Stream const& seen);
    // False: fault_ says why there is no value.
    bool TryEvaluate(Run const& run, double* values);
    bool RunCompiled(double* values);
    bool RunWithVector(std::optional<double> const& frame, double* values);
    bool ReadOwnKeys(double* keys);
    void PushTimes(lua_State* lua, std::optional<double> const& frame);
    bool TakeResult(int status, double* values);
    bool TakeVector(double* values);
    bool Failed(ExpressionFault fault);
    void CheckPlace(KFS_Stream const* stream, int time);
    [[noreturn]] void Fail(KFS_Stream const* stream, ExpressionFault fault);
    void Record(KFS_Stream const* stream, ExpressionFault const& fault);
    std::string Chain(std::size_t from, KFS_Stream const* last) const;
    std::string PathOfStream(KFS_Stream const& stream) const;
    StreamPaths const& PathsOfScene(SceneGroup const& scene) const;
    std::optional<double> FrameOf(Run const& run) const;

    KFS_ExpState& state_;
    std::shared_ptr<LuaState> lua_;
    std::array<Run, MaxDepth> runs_;
    std::size_t depth_ = 0;
    ExpressionFault fault_;                      // of the expression that has just ended
    std::optional<ExpressionFault> innerFault_;  // of the read that an expression asked for last
    // In a render's context the first ones hold for as long as it lives: to look again would be to walk over a tree that may be
    // being edited. Elsewhere these are of one scene, while they are current.
    bool const keepsPaths_;
    mutable std::vector<std::pair<SceneGroup const*, std::shared_ptr<StreamPaths const>>> paths_;
    std::vector<ExpressionError> errors_;
    std::unordered_set<KFS_Stream const*> failed_;  // the streams of these
};

}  // namespace kfshost
